// One scene of qorvex-focus: its place in the output directory (a copy of the raw header beside a
// link to the raw raster, or the product imported from a native archive into its working
// directory), one run of the focusing driver in a process group of its own (after the import, when
// there is one), its progress from the working file, and what it made.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "qorv_focus_options.h"

namespace qfocus {

using Clock = std::chrono::steady_clock;

enum class SceneState { Waiting, Running, Succeeded, Failed, Stopped };

struct Product {
    fs::path mPath;
    std::uintmax_t mBytes = 0;
};

/// What a scene focuses: a raw product, or one product of a native archive.
struct SceneInput {
    fs::path mRaw;                 // a raw product; empty for an archive's product
    fs::path mArchive;             // a native archive; empty for a raw product
    std::string mName;             // NAME of the scene's products
    std::string mFormat;           // the archive's format
    long long mFirstRecord = 0;    // the archive's records that make the product
    long long mRecordCount = 0;
};

struct SceneResult {
    SceneState mState = SceneState::Waiting;
    int mExitStatus = -1;            // the driver's exit status
    long mFailureId = 0;             // 0 on success
    std::string mFailureText;        // catalogue texts and parameters of the failure
    std::vector<std::string> mWarnings;  // the run's warnings: id, catalogue text, parameter
    std::vector<Product> mProducts;
    std::optional<double> mDoppler;  // Hz, after the ambiguity step when it ran
    std::optional<int> mAmbiguity;   // PRF cycles added
    std::optional<double> mVelocity; // m/s, the processing velocity after autofocus
    std::vector<std::pair<std::string, double>> mSteps;  // step title, seconds, as the driver timed them
    std::vector<std::string> mImportNotes;  // what the import found and handled
    double mSeconds = 0.0;
};

class Scene {
public:
    /// theDriver, theImporter: the qorvex and qorvex-import programs; theConfig: the directory of
    /// their configuration.
    Scene(const Options& theOptions, SceneInput theInput, fs::path theDriver, fs::path theImporter, fs::path theConfig);
    ~Scene();
    Scene(const Scene&) = delete;
    Scene& operator=(const Scene&) = delete;

    /// Makes the scene's place in the output directory; false (the scene has failed, with its
    /// words and id) when the raw file has no header or the directory cannot be written.
    bool prepare();
    /// A scene that fails before it runs (its archive cannot be read, its name is taken).
    void failBeforeStart(long theId, const std::string& theText) { fail(theId, theText); }
    /// Starts the driver.
    void start();
    /// Follows the working file and reaps the driver; true once the run has ended.
    bool poll();
    /// The operator stop: a value above 100 in the working file's first line.
    void requestStop();
    /// Ends the driver's process group at once, and removes what it left half-written.
    void kill();

    /// The input as given: the raw product or the archive.
    const fs::path& source() const { return mInput.mArchive.empty() ? mInput.mRaw : mInput.mArchive; }
    const SceneInput& input() const { return mInput; }
    /// The raw product the driver reads (in the output directory, or imported into the work directory).
    const fs::path& localRaw() const { return mLocalRaw; }
    const std::string& name() const { return mBase; }
    const SceneResult& result() const { return mResult; }
    const fs::path& argumentsPath() const { return mArgs; }
    /// The current step title and percentage, and the seconds since the run and the step began.
    const std::string& stepTitle() const { return mTitle; }
    int percent() const { return mPercent; }
    double elapsed() const;
    double stepElapsed() const;

private:
    void fail(long theId, const std::string& theText);
    void finish(int theStatus);
    void collect();
    void unlock();
    void runImport() const;
    void readImport();

    const Options& mOptions;
    SceneInput mInput;
    fs::path mDriver, mImporter, mConfig;
    std::string mBase;
    fs::path mRoot, mLocalRaw, mWork, mWorkingFile, mArgs;
    pid_t mPid = -1;
    int mLock = -1;  // the scene's lock file in its working directory, held from prepare to the end
    bool mStopRequested = false, mKilled = false;
    std::string mTitle;
    int mPercent = 0;
    Clock::time_point mStart, mStepStart;
    SceneResult mResult;
};

}  // namespace qfocus
