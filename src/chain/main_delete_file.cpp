// main_delete_file <name>: removes a temporary file on behalf of a focuser run that is ending.
//
// It is started without waiting by a failing run, so it gives the run a moment to close its
// files and retries a few times before giving up. Exit status 0 when the file is gone.
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

int main(int argc, char** argv)
{
    if (argc < 2) {
        std::fprintf(stderr, "usage: main_delete_file <file name>\n");
        return 2;
    }
    struct stat aStat {};
    for (int aTry = 0; aTry < 10; ++aTry) {
        if (::stat(argv[1], &aStat) != 0) return 0;
        if (std::remove(argv[1]) == 0) return 0;
        usleep(500000);
    }
    std::fprintf(stderr, "main_delete_file: cannot remove %s (errno %d)\n", argv[1], errno);
    return 1;
}
