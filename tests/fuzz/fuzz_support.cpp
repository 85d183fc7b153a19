#include "fuzz_support.h"

#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>

#include "qorv_enviroment.h"
#include "qorv_errors.h"

namespace fs = std::filesystem;

namespace qfuzz {

const std::string& scratchDir()
{
    static const std::string aDir = [] {
        const fs::path aBase = fs::is_directory("/dev/shm") ? fs::path("/dev/shm") : fs::temp_directory_path();
        const fs::path aDir = aBase / ("qorvex-fuzz-" + std::to_string(::getpid()));
        fs::create_directories(aDir);
        return aDir.string() + "/";
    }();
    return aDir;
}

std::string writeInput(const std::string& theName, const uint8_t* theData, std::size_t theSize)
{
    const std::string aPath = scratchDir() + theName;
    FILE* aFile = std::fopen(aPath.c_str(), "wb");
    if (!aFile) std::abort();
    if (theSize > 0 && std::fwrite(theData, 1, theSize, aFile) != theSize) std::abort();
    std::fclose(aFile);
    return aPath;
}

void fault(const std::string& theWhat)
{
    std::fprintf(stderr, "fuzz fault: %s\n", theWhat.c_str());
    std::abort();
}

void setUpRun()
{
    static bool aDone = false;
    if (aDone) return;
    aDone = true;
    const fs::path aDir(scratchDir());
    const fs::path aKeys = aDir / "keys";
    fs::create_directories(aKeys);
    fs::create_directories(aDir / "work");
    const fs::path aShare = fs::path(QORVEX_SOURCE_DIR) / "share/qorvex";
    for (const fs::path& aFrom : {aShare / "keys", fs::path(QORVEX_SOURCE_DIR) / "tests/store/keys"})
        for (const auto& aEntry : fs::directory_iterator(aFrom))
            fs::copy_file(aEntry.path(), aKeys / aEntry.path().filename(), fs::copy_options::overwrite_existing);
    // The settings and line pools of a run without its catalogues, trace or log.
    FILE* aConfig = std::fopen((aDir / "Qorvex_configuration.ini").c_str(), "w");
    if (!aConfig) std::abort();
    const std::string s = aShare.string();
    std::fprintf(aConfig, "%s/\n%s/mandatory/\n%s/\n%s/\n%s/map/\n%s/des/\n%s/gcp/\n%s/des/\n%s/des/\n%s/schema/\nLSBF\nNOT_ACTIVE\nNOT_USED\nNaN\n",
                 aKeys.c_str(), s.c_str(), (aDir / "work").c_str(), (aDir / "work").c_str(), s.c_str(), s.c_str(), s.c_str(),
                 s.c_str(), s.c_str(), s.c_str());
    std::fclose(aConfig);
    ::setenv("QORVEX_INIT_DIR", aDir.c_str(), 1);
    ::unsetenv("QORVEX_WORKING_DIR");
    ::unsetenv("QORVEX_WORKING_FILE");
    fdfInit(false, CQORV_VERSION_TEXT, false);
    // A failure is thrown to the harness instead of ending the process.
    gReportingMode = false;
    std::atexit([] {
        std::error_code aError;
        fs::remove_all(scratchDir(), aError);
    });
}

}  // namespace qfuzz
