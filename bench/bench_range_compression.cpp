// Range compression of a full ERS frame (28,000 echoes of 5,616 samples, 300 targets) through the
// driver (steps 0, 2 and 5: the driver runs no shorter chain from raw data): the step's own
// duration, the driver's wall time and peak memory, and the ratio of the step to the same number of
// forward and inverse 5,616-point transforms through the transform wrapper, measured in this run.
//
//   build/bin/bench_range_compression [build/bin]   (scratch files under $TMPDIR, about 1.5 GB, removed)
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <vector>

#include "qorv_fft.h"

extern char** environ;

namespace {

namespace fs = std::filesystem;

double fSince(std::chrono::steady_clock::time_point t0)
{
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
}

/// Runs a program and waits for it; returns its peak resident memory (MB), or -1 on failure.
long fRun(const std::vector<std::string>& theArgs)
{
    std::vector<char*> aArgv;
    for (const std::string& a : theArgs) aArgv.push_back(const_cast<char*>(a.c_str()));
    aArgv.push_back(nullptr);
    pid_t aPid = 0;
    if (posix_spawn(&aPid, aArgv[0], nullptr, nullptr, aArgv.data(), environ) != 0) return -1;
    int aStatus = 0;
    rusage aUsage{};
    if (wait4(aPid, &aStatus, 0, &aUsage) != aPid || !WIFEXITED(aStatus) || WEXITSTATUS(aStatus) != 0) return -1;
    return aUsage.ru_maxrss / 1024;
}

/// The seconds of the step's "DURATION [ range compression]" trace line, or -1.
double fStepSeconds(const fs::path& theTrace)
{
    std::ifstream aIn(theTrace);
    const std::string aTag = "DURATION [ range compression]  (s) = ";
    for (std::string aLine; std::getline(aIn, aLine);)
        if (aLine.rfind(aTag, 0) == 0) return std::atof(aLine.c_str() + aTag.size());
    return -1.0;
}

}  // namespace

int main(int argc, char** argv)
{
    const fs::path aBin = fs::canonical(argc > 1 ? fs::path(argv[1]) : fs::path(argv[0]).parent_path());
    const fs::path aTop = fs::canonical(fs::path(QORVEX_SOURCE_DIR));
    const char* aTmp = std::getenv("TMPDIR");
    std::string aPattern = std::string(aTmp ? aTmp : "/tmp") + "/qorvex-bench-rc-XXXXXX";
    std::vector<char> aName(aPattern.begin(), aPattern.end());
    aName.push_back('\0');
    if (!mkdtemp(aName.data())) return 1;
    const fs::path d = aName.data();
    fs::create_directories(d / "work");
    fs::create_directories(d / "etc");
    int aResult = 1;
    do {
        if (fRun({"/bin/bash", (aTop / "tools/qorvex-make-config").string(), "--share", (aTop / "share/qorvex").string(), "--exe",
                  aBin.string(), "--work", (d / "work").string(), "--out", (d / "etc").string()}) < 0)
            break;
        setenv("QORVEX_INIT_DIR", (d / "etc").c_str(), 1);
        setenv("QORVEX_WORKING_FILE", (d / "work/bench.working").c_str(), 1);
        std::ofstream(d / "work/bench.working") << "0\nbench\n";
        std::printf("== simulating a full ERS frame\n");
        std::fflush(stdout);
        if (fRun({(aBin / "qorvex_simulate").string(), "--preset", "ers2", "--full-frame", "--write-doppler", "--no-noise",
                  "--quiet", "--out", (d / "ers_raw").string()}) < 0)
            break;
        std::ostringstream aArgs;
        aArgs << "bench: range compression of a full ERS frame\n" << (d / "ers_raw").string() << "\nOK\n"
              << (d / "ers_slc").string() << "\n1\n5\nNotOK\nNotOK\nNotOK\n0.333\n0\nNotOK\nNotOK\nNotOK\nNotOK\nNotOK\nOK\nNotOK\nOK\nNotOK\n1\n";
        std::ofstream(d / "args.txt") << aArgs.str();
        const auto t0 = std::chrono::steady_clock::now();
        const long aPeak = fRun({(aBin / "qorvex").string(), (d / "args.txt").string()});
        const double aWall = fSince(t0);
        const double aStep = fStepSeconds(d / "work/Process.trace");
        if (aPeak < 0 || aStep < 0.0) {
            std::fprintf(stderr, "the driver failed (peak %ld, step %g); its trace:\n", aPeak, aStep);
            std::ifstream aTrace(d / "work/Process.trace");
            std::fprintf(stderr, "%s\n", std::string(std::istreambuf_iterator<char>(aTrace), {}).c_str());
            break;
        }

        // The reference: one forward and one inverse transform per echo, on a fresh copy each time.
        const int aLines = 28000, aSize = 5616;
        FftBuffer aEcho(aSize), aLine(aSize);
        for (int i = 0; i < aSize; ++i) aEcho[static_cast<std::size_t>(i)] = fcomplex(std::sin(0.01f * i), 0.5f);
        const FftPlan1D aForward(aSize, FftDirection::Forward), aInverse(aSize, FftDirection::Inverse);
        const auto t1 = std::chrono::steady_clock::now();
        for (int l = 0; l < aLines; ++l) {
            std::memcpy(aLine.data(), aEcho.data(), aLine.size() * sizeof(fcomplex));
            aForward.execute(aLine.data());
            aInverse.execute(aLine.data());
        }
        const double aFft = fSince(t1);
        std::printf("driver wall %.2f s and peak memory %ld MB (steps 0, 2 and 5)\n", aWall, aPeak);
        std::printf("range compression %.2f s, %d forward + inverse %d-point transforms %.2f s: ratio %.2f\n", aStep, aLines,
                    aSize, aFft, aStep / aFft);
        aResult = 0;
    } while (false);
    fs::remove_all(d);
    return aResult;
}
