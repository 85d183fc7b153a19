// Shared test support: temporary directories, an in-process run environment whose failures throw
// instead of ending the process, and a sandbox that runs the real driver program.
#pragma once

#include <filesystem>
#include <map>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace qtest {

namespace fs = std::filesystem;

/// share/qorvex of the source tree (key files, catalogues, defaults).
fs::path sourceShareDir();
/// Directory of the built programs (qorvex, main_delete_file, tools).
fs::path binaryDir();
/// Directory of test data owned by the tests (tests/data).
fs::path testDataDir();

/// A fresh directory under the system's temporary directory, removed with the object
/// (unless QORVEX_KEEP_TEST_DIRS is set in the environment).
class TempDir {
public:
    explicit TempDir(const std::string& thePrefix = "qorvex-test");
    ~TempDir();
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    const fs::path& path() const { return mPath; }
    fs::path operator/(const std::string& theName) const { return mPath / theName; }

private:
    fs::path mPath;
};

std::string readFile(const fs::path& thePath);
void writeFile(const fs::path& thePath, const std::string& theText);
std::vector<std::string> readLines(const fs::path& thePath);

/// Writes Qorvex_configuration.ini into theEtcDir for a working directory, pointing at the
/// source share directory unless keys/des directories are given.
struct ConfigOptions {
    fs::path mKeysDir;       // empty: share/qorvex/keys
    fs::path mMandatoryDir;  // empty: share/qorvex/mandatory
    fs::path mDesDir;        // empty: share/qorvex/des
    std::string mTracing = "ACTIVE";
    std::string mByteOrder = "LSBF";
    std::string mDummy = "-9999";
};
void writeConfiguration(const fs::path& theEtcDir, const fs::path& theWorkDir, const ConfigOptions& theOptions = {});

/// Thrown by the exit handler of an InProcessEnvironment in place of ending the process.
struct QorvexExit {
    int mId;
};

/// Brings the runtime up in this process (fdfInit with tracing on) in a temporary working
/// directory. Failures (QORV_FATAL) run their whole report sequence and then throw QorvexExit.
/// The environment is torn down by the destructor; a test that caught a failure may re-init.
class InProcessEnvironment {
public:
    explicit InProcessEnvironment(const ConfigOptions& theOptions = {});
    ~InProcessEnvironment();
    InProcessEnvironment(const InProcessEnvironment&) = delete;
    InProcessEnvironment& operator=(const InProcessEnvironment&) = delete;

    /// Runs fdfInit again (after a failure closed the run).
    void reinit();
    const fs::path& work() const { return mWork.path(); }
    fs::path workPath(const std::string& theName) const { return mWork.path() / theName; }
    std::string trace() const;
    std::string log() const;

private:
    TempDir mWork;
    ConfigOptions mOptions;
};

/// Runs a statement that must fail with a given id through QORV_FATAL.
#define EXPECT_QORV_FAILURE(statement, id)                                                     \
    do {                                                                                        \
        int qorvGotId_ = 0;                                                                     \
        try {                                                                                   \
            statement;                                                                          \
        } catch (const ::qtest::QorvexExit& e) {                                                \
            qorvGotId_ = e.mId;                                                                 \
        }                                                                                       \
        EXPECT_EQ(qorvGotId_, (id)) << "statement: " #statement;                               \
    } while (0)

/// Result of a real process.
struct RunResult {
    int mStatus = -1;        // exit status, or 128 + signal
    std::string mStdout;
    std::string mStderr;
    int mExitId = -1;        // from the last "QORVEX EXIT ID: " line on standard error, -1 if none
};

/// Runs a program with extra environment variables, in a working directory, with a time limit.
RunResult runProgram(const fs::path& theProgram, const std::vector<std::string>& theArgs,
                     const std::map<std::string, std::string>& theEnv, const fs::path& theCwd,
                     int theTimeoutSeconds = 300);

/// A temporary directory set up for the driver program: etc/ (configuration), work/ (working
/// directory and working file), data/ (inputs and products).
class DriverSandbox {
public:
    explicit DriverSandbox(const ConfigOptions& theOptions = {});
    fs::path etc() const { return mRoot.path() / "etc"; }
    fs::path work() const { return mRoot.path() / "work"; }
    fs::path data() const { return mRoot.path() / "data"; }
    fs::path workingFile() const { return work() / "Process.working"; }

    /// The 19 arguments of a run (and optional extras), with defaults that run nothing heavy.
    static std::vector<std::string> defaultArguments(const fs::path& theInput, const fs::path& theOutputRoot);
    /// Writes an arguments file (first line a comment of ours, then one argument per line).
    fs::path writeArguments(const std::vector<std::string>& theArgs, const std::string& theName = "args.txt");
    /// Runs the driver with the arguments file; extra environment on top of QORVEX_INIT_DIR.
    RunResult run(const fs::path& theArgumentsFile, std::map<std::string, std::string> theEnv = {},
                  int theTimeoutSeconds = 300) const;
    /// Runs qorvex_simulate with theOptions, writing theRaw quietly with this sandbox's configuration.
    RunResult simulate(const fs::path& theRaw, std::vector<std::string> theOptions) const;
    std::string trace() const { return readFile(work() / "Process.trace"); }
    std::string log() const { return readFile(work() / "Process.log"); }

private:
    TempDir mRoot;
};

}  // namespace qtest
