#include "qorvex_test_support.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <random>
#include <sstream>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_progress.h"

extern char** environ;

namespace qtest {

fs::path sourceShareDir() { return QORVEX_SOURCE_SHARE_DIR; }
fs::path binaryDir() { return QORVEX_BIN_DIR; }
fs::path testDataDir() { return QORVEX_TEST_DATA_DIR; }

TempDir::TempDir(const std::string& thePrefix)
{
    std::random_device aRandom;
    for (int aTry = 0; aTry < 100; ++aTry) {
        const fs::path aPath = fs::temp_directory_path() / (thePrefix + "-" + std::to_string(::getpid()) + "-" +
                                                            std::to_string(aRandom() % 1000000));
        std::error_code aError;
        if (fs::create_directory(aPath, aError)) {
            mPath = aPath;
            return;
        }
    }
    throw std::runtime_error("cannot create a temporary directory");
}

TempDir::~TempDir()
{
    if (std::getenv("QORVEX_KEEP_TEST_DIRS")) return;
    std::error_code aError;
    fs::remove_all(mPath, aError);
}

std::string readFile(const fs::path& thePath)
{
    std::ifstream aIn(thePath, std::ios::binary);
    std::stringstream aText;
    aText << aIn.rdbuf();
    return aText.str();
}

void writeFile(const fs::path& thePath, const std::string& theText)
{
    std::ofstream aOut(thePath, std::ios::binary | std::ios::trunc);
    aOut << theText;
}

std::vector<std::string> readLines(const fs::path& thePath)
{
    std::vector<std::string> aLines;
    std::ifstream aIn(thePath);
    std::string aLine;
    while (std::getline(aIn, aLine)) aLines.push_back(aLine);
    return aLines;
}

void writeConfiguration(const fs::path& theEtcDir, const fs::path& theWorkDir, const ConfigOptions& o)
{
    fs::create_directories(theEtcDir);
    fs::create_directories(theWorkDir);
    const fs::path aShare = sourceShareDir();
    const auto dir = [](const fs::path& p) { return p.string() + "/"; };
    std::ostringstream aText;
    aText << dir(o.mKeysDir.empty() ? aShare / "keys" : o.mKeysDir) << "\n"
          << dir(o.mMandatoryDir.empty() ? aShare / "mandatory" : o.mMandatoryDir) << "\n"
          << dir(theWorkDir) << "\n"
          << dir(binaryDir()) << "\n"
          << dir(aShare / "map") << "\n"
          << dir(o.mDesDir.empty() ? aShare / "des" : o.mDesDir) << "\n"
          << dir(aShare / "gcp") << "\n"
          << dir(aShare / "des") << "\n"
          << dir(aShare / "des") << "\n"
          << dir(aShare / "schema") << "\n"
          << o.mByteOrder << "\n"
          << o.mTracing << "\n"
          << "NOT_USED\n"
          << o.mDummy << "\n";
    writeFile(theEtcDir / "Qorvex_configuration.ini", aText.str());
}

// ------------------------------------------------------------------------------------------------

namespace {

[[noreturn]] void throwingExit(int theId) { throw QorvexExit{theId}; }

}  // namespace

InProcessEnvironment::InProcessEnvironment(const ConfigOptions& theOptions) : mWork("qorvex-env"), mOptions(theOptions)
{
    writeConfiguration(mWork.path() / "etc", mWork.path() / "work", mOptions);
    reinit();
}

void InProcessEnvironment::reinit()
{
    ::setenv("QORVEX_INIT_DIR", (mWork.path() / "etc").c_str(), 1);
    ::unsetenv("QORVEX_WORKING_DIR");
    ::unsetenv("QORVEX_WORKING_FILE");
    ::unsetenv("QORVEX_BATCH_DIR");
    ::unsetenv("QORVEX_GCP_DATABASE_DIR");
    fdfSetExitHandler(throwingExit);
    fdfSetProgressRetrySleepMs(1);
    fdfInit(true, CQORV_VERSION_TEXT, true);
    // Tests keep their own standard streams.
    fdfRestoreStandardStreams();
}

InProcessEnvironment::~InProcessEnvironment()
{
    gTrace.close();
    gLog.close();
    gTraceActive = false;
    fdfFreeSettings();
    fdfRestoreStandardStreams();
    fdfSetExitHandler(nullptr);
    fdfSetProgressRetrySleepMs(1000);
    ::unsetenv("QORVEX_INIT_DIR");
}

std::string InProcessEnvironment::trace() const { return readFile(mWork.path() / "work" / "Process.trace"); }
std::string InProcessEnvironment::log() const { return readFile(mWork.path() / "work" / "Process.log"); }

// ------------------------------------------------------------------------------------------------

namespace {

void drain(int theFd, std::string& theOut)
{
    char aBuffer[4096];
    const ssize_t n = ::read(theFd, aBuffer, sizeof aBuffer);
    if (n > 0) theOut.append(aBuffer, static_cast<std::size_t>(n));
}

int lastExitId(const std::string& theStderr)
{
    const std::string aKey = "QORVEX EXIT ID: ";
    const std::size_t aPos = theStderr.rfind(aKey);
    if (aPos == std::string::npos) return -1;
    return std::atoi(theStderr.c_str() + aPos + aKey.size());
}

}  // namespace

RunResult runProgram(const fs::path& theProgram, const std::vector<std::string>& theArgs,
                     const std::map<std::string, std::string>& theEnv, const fs::path& theCwd, int theTimeoutSeconds)
{
    int aOut[2], aErr[2];
    if (::pipe(aOut) != 0 || ::pipe(aErr) != 0) throw std::runtime_error("pipe");
    const pid_t aPid = ::fork();
    if (aPid < 0) throw std::runtime_error("fork");
    if (aPid == 0) {
        ::dup2(aOut[1], 1);
        ::dup2(aErr[1], 2);
        ::close(aOut[0]);
        ::close(aErr[0]);
        if (!theCwd.empty() && ::chdir(theCwd.c_str()) != 0) ::_exit(126);
        for (const auto& [k, v] : theEnv) ::setenv(k.c_str(), v.c_str(), 1);
        std::vector<char*> aArgv{const_cast<char*>(theProgram.c_str())};
        for (const std::string& a : theArgs) aArgv.push_back(const_cast<char*>(a.c_str()));
        aArgv.push_back(nullptr);
        ::execv(theProgram.c_str(), aArgv.data());
        ::_exit(127);
    }
    ::close(aOut[1]);
    ::close(aErr[1]);
    RunResult aResult;
    const auto aDeadline = std::chrono::steady_clock::now() + std::chrono::seconds(theTimeoutSeconds);
    bool aOutOpen = true, aErrOpen = true;
    while (aOutOpen || aErrOpen) {
        pollfd aFds[2] = {{aOut[0], POLLIN, 0}, {aErr[0], POLLIN, 0}};
        const int r = ::poll(aFds, 2, 200);
        if (r > 0) {
            for (int k = 0; k < 2; ++k) {
                if (!(aFds[k].revents & (POLLIN | POLLHUP))) continue;
                std::string& aTarget = k == 0 ? aResult.mStdout : aResult.mStderr;
                const std::size_t aBefore = aTarget.size();
                drain(aFds[k].fd, aTarget);
                if (aTarget.size() == aBefore) (k == 0 ? aOutOpen : aErrOpen) = false;
            }
        }
        if (std::chrono::steady_clock::now() > aDeadline) {
            ::kill(aPid, SIGKILL);
            break;
        }
    }
    ::close(aOut[0]);
    ::close(aErr[0]);
    int aStatus = 0;
    ::waitpid(aPid, &aStatus, 0);
    aResult.mStatus = WIFEXITED(aStatus) ? WEXITSTATUS(aStatus) : 128 + WTERMSIG(aStatus);
    aResult.mExitId = lastExitId(aResult.mStderr);
    return aResult;
}

// ------------------------------------------------------------------------------------------------

DriverSandbox::DriverSandbox(const ConfigOptions& theOptions) : mRoot("qorvex-run")
{
    writeConfiguration(etc(), work(), theOptions);
    fs::create_directories(data());
}

std::vector<std::string> DriverSandbox::defaultArguments(const fs::path& theInput, const fs::path& theOutputRoot)
{
    // 0 input, 1 focus, 2 output root, 3/4 looks, 5 multi-look, 6 tiff, 7 delete, 8 tiff arg,
    // 9 look arg, 10 ambiguity, 11 end if missing, 12 step 5 last, 13 look arg, 14-17 skip steps
    // 0-3 ("OK" skips), 18 look arg.
    return {theInput.string(), "OK", theOutputRoot.string(), "1", "5", "NotOK", "NotOK", "NotOK", "0.333",
            "0", "NotOK", "NotOK", "NotOK", "NotOK", "NotOK", "NotOK", "NotOK", "NotOK", "NotOK"};
}

fs::path DriverSandbox::writeArguments(const std::vector<std::string>& theArgs, const std::string& theName)
{
    std::string aText = "qorvex test arguments\n";
    for (const std::string& a : theArgs) aText += a + "\n";
    const fs::path aPath = data() / theName;
    writeFile(aPath, aText);
    return aPath;
}

RunResult DriverSandbox::simulate(const fs::path& theRaw, std::vector<std::string> theOptions) const
{
    for (const std::string& a : {std::string("--quiet"), std::string("--out"), theRaw.string(), std::string("--config"), etc().string()})
        theOptions.push_back(a);
    return runProgram(binaryDir() / "qorvex_simulate", theOptions, {}, data());
}

RunResult DriverSandbox::run(const fs::path& theArgumentsFile, std::map<std::string, std::string> theEnv,
                             int theTimeoutSeconds) const
{
    theEnv.emplace("QORVEX_INIT_DIR", etc().string());
    return runProgram(binaryDir() / "qorvex", {theArgumentsFile.string()}, theEnv, work(), theTimeoutSeconds);
}

}  // namespace qtest
