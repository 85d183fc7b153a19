#include "qorv_focus_scene.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <sstream>

#include "qorv_generic_utility.h"
#include "qorv_json.h"

namespace qfocus {

namespace {

constexpr long kMissingFile = 261122;   // the focuser's id of a missing input
constexpr long kCreateFile = 261123;    // the focuser's id of an output that can't be created
constexpr long kOperatorStop = 326400;
constexpr std::size_t kErrorLineWidth = 48;  // the result block breaks longer parameters at this width

std::string readText(const fs::path& thePath)
{
    std::ifstream f(thePath, std::ios::binary);
    std::ostringstream s;
    s << f.rdbuf();
    return s.str();
}

/// Whole-file writes replace the file at once: the driver polls the working file and must never
/// read it half-written.
bool writeText(const fs::path& thePath, const std::string& theText) { return fqorvWriteTextAtomically(thePath.string(), theText); }

/// The value of the header row that follows the row holding theKey (user keys are rows of
/// key and value).
std::optional<double> userKeyValue(const fs::path& theHeader, const std::string& theKey)
{
    std::ifstream f(theHeader);
    std::string aLine;
    while (std::getline(f, aLine)) {
        if (aLine.find(">" + theKey) == std::string::npos) continue;
        if (!std::getline(f, aLine)) break;
        const std::size_t a = aLine.find('>'), b = aLine.find('<', a == std::string::npos ? 0 : a);
        if (a == std::string::npos || b == std::string::npos) break;
        char* aEnd = nullptr;
        const std::string v = aLine.substr(a + 1, b - a - 1);
        const double d = std::strtod(v.c_str(), &aEnd);
        if (aEnd != v.c_str()) return d;
        break;
    }
    return std::nullopt;
}

std::optional<double> elementValue(const fs::path& theHeader, const std::string& theTag)
{
    const std::string aText = readText(theHeader);
    const std::size_t a = aText.find("<" + theTag + ">");
    if (a == std::string::npos) return std::nullopt;
    char* aEnd = nullptr;
    const char* p = aText.c_str() + a + theTag.size() + 2;
    const double d = std::strtod(p, &aEnd);
    return aEnd != p ? std::optional<double>(d) : std::nullopt;
}

}  // namespace

Scene::Scene(const Options& theOptions, SceneInput theInput, fs::path theDriver, fs::path theImporter, fs::path theConfig)
    : mOptions(theOptions), mInput(std::move(theInput)), mDriver(std::move(theDriver)), mImporter(std::move(theImporter)),
      mConfig(std::move(theConfig)), mBase(mInput.mName)
{
    mRoot = mOptions.mOut / mBase;
    mWork = mOptions.mOut / (mBase + ".qorvex");
    // An archive's product is imported into the scene's working directory; a raw product is linked
    // into the output directory.
    mLocalRaw = mInput.mArchive.empty() ? mOptions.mOut / mInput.mRaw.filename() : mWork / (mBase + "_raw");
    mWorkingFile = mWork / "Process.working";
    mArgs = mWork / "arguments.txt";
}

Scene::~Scene() { unlock(); }

void Scene::unlock()
{
    if (mLock >= 0) close(mLock);
    mLock = -1;
}

void Scene::fail(long theId, const std::string& theText)
{
    mResult.mState = SceneState::Failed;
    mResult.mFailureId = theId;
    mResult.mFailureText = theText;
}

bool Scene::prepare()
{
    std::error_code e;
    const bool aArchive = !mInput.mArchive.empty();
    const fs::path aHeader = mInput.mRaw.string() + ".sml";
    if (!aArchive && !fs::is_regular_file(aHeader, e)) {
        fail(kMissingFile, "the raw file has no header " + aHeader.string());
        return false;
    }
    fs::create_directories(mWork, e);
    const fs::path aLock = mWork / "lock";
    mLock = e ? -1 : open(aLock.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0644);
    if (mLock < 0) {
        fail(kCreateFile, "the output directory " + mOptions.mOut.string() + " cannot be written");
        return false;
    }
    // One run per scene and output directory: a second run (another qorvex-focus, another job of a
    // workflow) would overwrite the first one's products under it. The driver inherits the lock,
    // so it holds while the driver writes even if the front end is killed.
    if (flock(mLock, LOCK_EX | LOCK_NB) != 0) {
        close(mLock);
        mLock = -1;
        fail(kCreateFile, "another run is focusing " + mBase + " into " + mOptions.mOut.string());
        return false;
    }
    // The chain writes into the raw product's header (PRF changes, the Doppler table): it runs on a
    // copy beside a link to the raster, so that the archive is only read. An archive's product is
    // the import's own.
    const fs::path aLocalHeader = mLocalRaw.string() + ".sml";
    if (aArchive) {
        for (const char* x : {"", ".sml", "_old.sml", ".part"}) fs::remove(mLocalRaw.string() + x, e);
        fs::remove(mWork / "import.json", e);
    } else if (!fs::equivalent(mInput.mRaw, mLocalRaw, e)) {
        fs::remove(mLocalRaw, e);
        fs::create_symlink(fs::absolute(mInput.mRaw), mLocalRaw, e);
        if (!e) fs::copy_file(aHeader, aLocalHeader, fs::copy_options::overwrite_existing, e);
        if (e) {
            fail(kCreateFile, "cannot place the raw product in " + mOptions.mOut.string() + ": " + e.message());
            return false;
        }
        fs::remove(mLocalRaw.string() + "_old.sml", e);  // a backup of an earlier run's header copy
    }
    if (!writeText(mArgs, argumentsFile(mOptions, mLocalRaw, mRoot)) ||
        !writeText(mWorkingFile, aArchive ? "0\nimport\n" : "0\nwaiting\n")) {
        fail(kCreateFile, "cannot write in " + mWork.string());
        return false;
    }
    return true;
}

/// In the scene's process, before the driver: imports the archive's records of this scene into
/// the working directory. Its status, when it failed, is the scene's.
void Scene::runImport() const
{
    std::vector<std::string> a = {mImporter.string(), "--out", mWork.string(), "--lines",
                                  std::to_string(mInput.mFirstRecord) + ":" + std::to_string(mInput.mRecordCount),
                                  "--json", (mWork / "import.json").string(), "--quiet", "--config", mConfig.string()};
    if (!mOptions.mOrbit.empty()) a.insert(a.end(), {"--orbit", mOptions.mOrbit.string()});
    if (!mOptions.mAux.empty()) a.insert(a.end(), {"--aux", mOptions.mAux.string()});
    a.push_back(mInput.mArchive.string());
    std::vector<char*> aArgv;
    for (std::string& x : a) aArgv.push_back(x.data());
    aArgv.push_back(nullptr);
    const pid_t aPid = fork();
    if (aPid == 0) {
        execv(aArgv[0], aArgv.data());
        _exit(127);
    }
    int aStatus = 0;
    if (aPid < 0 || waitpid(aPid, &aStatus, 0) != aPid) _exit(127);
    const int aExit = WIFEXITED(aStatus) ? WEXITSTATUS(aStatus) : 128 + WTERMSIG(aStatus);
    // 0: imported; 1: imported with warnings, which the summary reports.
    if (aExit > 1) _exit(aExit);
}

void Scene::start()
{
    mStart = mStepStart = Clock::now();
    mResult.mState = SceneState::Running;
    const std::string aOut = (mWork / "stdout.txt").string(), aErr = (mWork / "stderr.txt").string();
    mPid = fork();
    if (mPid == 0) {
        setpgid(0, 0);  // Ctrl-C at the terminal reaches the front end, which stops the run its own way
        signal(SIGINT, SIG_DFL);
        const int o = open(aOut.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
        const int r = open(aErr.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
        if (o >= 0) dup2(o, 1);
        if (r >= 0) dup2(r, 2);
        setenv("QORVEX_INIT_DIR", mConfig.c_str(), 1);
        setenv("QORVEX_WORKING_DIR", (mWork.string() + "/").c_str(), 1);
        setenv("QORVEX_WORKING_FILE", mWorkingFile.c_str(), 1);
        if (mLock >= 0) fcntl(mLock, F_SETFD, 0);  // the driver holds the scene's lock with it
        if (chdir(mWork.c_str()) != 0) _exit(127);
        if (!mInput.mArchive.empty()) runImport();
        execl(mDriver.c_str(), mDriver.c_str(), mArgs.c_str(), static_cast<char*>(nullptr));
        _exit(127);
    }
    if (mPid > 0) setpgid(mPid, mPid);
    if (mPid < 0) fail(kCreateFile, "cannot start " + mDriver.string());
}

bool Scene::poll()
{
    if (mResult.mState != SceneState::Running) return true;
    std::ifstream f(mWorkingFile);
    std::string aPercent, aTitle;
    if (std::getline(f, aPercent) && std::getline(f, aTitle)) {
        aTitle.erase(0, aTitle.find_first_not_of(' '));
        aTitle.erase(aTitle.find_last_not_of(" \r") + 1);
    }
    if (!aTitle.empty()) {
        const int p = std::atoi(aPercent.c_str());
        if (aTitle != mTitle && aTitle != "waiting") {
            mTitle = aTitle;
            mStepStart = Clock::now();
        }
        if (p >= 0 && p <= 100) mPercent = p;
    }
    int aStatus = 0;
    if (mPid > 0 && waitpid(mPid, &aStatus, WNOHANG) == mPid) {
        finish(aStatus);
        return true;
    }
    return false;
}

void Scene::requestStop()
{
    if (mResult.mState != SceneState::Running || mStopRequested) return;
    mStopRequested = true;
    writeText(mWorkingFile, "101\n" + (mTitle.empty() ? std::string("stop") : mTitle) + "\n");
}

void Scene::kill()
{
    if (mResult.mState != SceneState::Running || mPid <= 0) return;
    mKilled = true;
    ::kill(-mPid, SIGKILL);
    int aStatus = 0;
    waitpid(mPid, &aStatus, 0);
    finish(aStatus);
}

double Scene::elapsed() const
{
    return mResult.mState == SceneState::Waiting ? 0.0 : std::chrono::duration<double>(Clock::now() - mStart).count();
}

double Scene::stepElapsed() const { return std::chrono::duration<double>(Clock::now() - mStepStart).count(); }

void Scene::finish(int theStatus)
{
    mPid = -1;
    mResult.mSeconds = elapsed();
    mResult.mExitStatus = WIFEXITED(theStatus) ? WEXITSTATUS(theStatus) : 128 + WTERMSIG(theStatus);
    const std::string aErr = readText(mWork / "stderr.txt");
    const std::size_t at = aErr.rfind("QORVEX EXIT ID: ");
    const long aId = at == std::string::npos ? -1 : std::atol(aErr.c_str() + at + 16);
    if (mResult.mExitStatus == 0 && aId <= 0) {
        mResult.mState = SceneState::Succeeded;
    } else {
        // The focuser's result block: "-1", the step's title, the primary and the secondary text,
        // the parameters.
        std::istringstream aBlock(readText(mWorkingFile.string() + "_error"));
        std::string aLine, aText;
        bool aBroken = false;  // the previous line was a long parameter broken at the block's width
        for (int n = 0; std::getline(aBlock, aLine); ++n) {
            if (n >= 2 && aLine.find_first_not_of(' ') != std::string::npos)
                aText += (aText.empty() || aBroken ? "" : " / ") + aLine;
            aBroken = aLine.size() == kErrorLineWidth;
        }
        if (mKilled) aText = "ended at once by a second interrupt";
        else if (aId == kOperatorStop) aText = "stopped by the operator";
        else if (aText.empty()) aText = "the focuser ended with status " + std::to_string(mResult.mExitStatus);
        fail(aId > 0 ? aId : (mKilled ? kOperatorStop : 0), aText);
        if (mStopRequested || mKilled || aId == kOperatorStop) mResult.mState = SceneState::Stopped;
        // What the run was writing stands under "NAME_PRODUCT_tmp" names: nothing of it is kept.
        // A product name holds no "_", so "a_b_slc_tmp" of a scene "a_b" is not taken for "a"'s.
        std::error_code e;
        for (const auto& d : fs::directory_iterator(mOptions.mOut, e)) {
            const std::string n = d.path().filename().string();
            const std::size_t t = n.find("_tmp", mBase.size());
            if (n.rfind(mBase + "_", 0) == 0 && t != std::string::npos &&
                n.find('_', mBase.size() + 1) == t)
                fs::remove(d.path(), e);
        }
    }
    collect();
    if (!mInput.mArchive.empty()) readImport();
    // The imported raw product is an intermediate file of the scene.
    if (!mInput.mArchive.empty() && !mOptions.mKeepIntermediate) {
        std::error_code e;
        for (const char* x : {"", ".sml", "_old.sml", ".part"}) fs::remove(mLocalRaw.string() + x, e);
    }
    unlock();
}

/// What the import of an archive's product said: its notes and warnings, and its failure, which
/// is the scene's when the driver never ran.
void Scene::readImport()
{
    std::error_code e;
    const fs::path aPath = mWork / "import.json";
    if (!fs::is_regular_file(aPath, e)) return;
    try {
        const CJson j = CJson::parseFile(aPath.string());
        const CJson& x = j["inputs"][std::size_t{0}];
        if (x.has("notes"))
            for (const CJson& n : x["notes"].elements()) mResult.mImportNotes.push_back(n.string());
        if (x.has("products"))
            for (const CJson& p : x["products"].elements())
                for (const CJson& n : p["notes"].elements()) mResult.mImportNotes.push_back(n.string());
        if (x.has("warnings"))
            for (const CJson& w : x["warnings"].elements())
                mResult.mWarnings.push_back(std::to_string(static_cast<long>(w["id"].number())) + " " + w["text"].string() + ": " +
                                            w["parameter"].string());
        if (x.has("failure") && !x["failure"].isNull()) {
            const CJson& f = x["failure"];
            fail(static_cast<long>(f["id"].number()), "import: " + f["text"].string() + ": " + f["parameter"].string());
        }
    } catch (const std::exception&) {
        // An import that ended before its report: the driver's status and words stand.
    }
}

void Scene::collect()
{
    std::error_code e;
    for (const char* s : {"_slc", "_pwr", "_slc.tif", "_pwr.tif", "_rc"}) {
        const fs::path p = mRoot.string() + s;
        if (fs::is_regular_file(p, e)) mResult.mProducts.push_back({p, fs::file_size(p, e)});
    }
    for (const char* s : {"_slc.sml", "_pwr.sml", "_rc.sml"}) {
        mResult.mDoppler = userKeyValue(mRoot.string() + s, "DOPPLER VALUE AFTER AMBIGUITY CORRECTION");
        if (mResult.mDoppler) break;
    }
    if (!mResult.mDoppler) mResult.mDoppler = userKeyValue(mLocalRaw.string() + ".sml", "DOPPLER VALUE(0   0)");
    // The driver's trace times each step: "DURATION [ <title>]  (s) = <seconds>".
    const std::string aTrace = readText(mWork / "Process.trace");
    for (std::size_t at = aTrace.find("DURATION ["); at != std::string::npos; at = aTrace.find("DURATION [", at + 1)) {
        const std::size_t aClose = aTrace.find(']', at), aEq = aTrace.find("= ", at);
        if (aClose == std::string::npos || aEq == std::string::npos) break;
        std::string aTitle = aTrace.substr(at + 10, aClose - at - 10);
        aTitle.erase(0, aTitle.find_first_not_of(' '));
        mResult.mSteps.emplace_back(aTitle, std::atof(aTrace.c_str() + aEq + 2));
    }
    const std::size_t at = aTrace.rfind(", rounded: ");
    if (at != std::string::npos) mResult.mAmbiguity = std::atoi(aTrace.c_str() + at + 11);
    mResult.mVelocity = elementValue(mRoot.string() + "_par.sml", "Velocity");
    // Warnings stand in the log as "WARNING : [ERROR ID : <id>] <primary> [<secondary>]" and a
    // line of parameters; each different one is reported once.
    std::istringstream aLog(readText(mWork / "Process.log"));
    std::string aLine, aParameter;
    while (std::getline(aLog, aLine)) {
        if (aLine.rfind("WARNING : [ERROR ID : ", 0) != 0 || !std::getline(aLog, aParameter)) continue;
        aParameter.erase(0, aParameter.find_first_not_of(' '));
        aParameter.erase(aParameter.find_last_not_of(' ') + 1);
        const std::size_t aClose = aLine.find("] ", 22);
        if (aClose == std::string::npos || std::atol(aLine.c_str() + 22) == 0) continue;  // id 0: a step's end
        const std::string aText = aLine.substr(22, aClose - 22) + " " + aLine.substr(aClose + 2) +
                                  (aParameter.empty() ? "" : ": " + aParameter);
        if (std::find(mResult.mWarnings.begin(), mResult.mWarnings.end(), aText) == mResult.mWarnings.end())
            mResult.mWarnings.push_back(aText);
    }
}

}  // namespace qfocus
