// qorvex-focus: the focusing chain for people and batches. Each raw product given on the command
// line is focused by one run of the qorvex driver; up to --jobs runs go at once. Progress is
// redrawn in place on a terminal and logged line by line otherwise; Ctrl-C stops the runs through
// the working file, a second Ctrl-C ends them at once. A summary per scene closes the run.
#include <algorithm>
#include <signal.h>
#include <unistd.h>

#include <cmath>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "qorv_focus_options.h"
#include "qorv_focus_scene.h"
#include "qorv_import.h"
#include "qorv_import_failure.h"
#include "qorv_program_config.h"
#include "qorv_json.h"

using namespace qfocus;

namespace {

volatile std::sig_atomic_t gInterrupts = 0;

void onInterrupt(int) { gInterrupts = gInterrupts + 1; }

std::string clock(double s)
{
    if (s < 0 || !std::isfinite(s)) return "--:--";
    const long t = std::lround(s);
    char b[32];
    if (t >= 3600) std::snprintf(b, sizeof b, "%ld:%02ld:%02ld", t / 3600, t / 60 % 60, t % 60);
    else std::snprintf(b, sizeof b, "%ld:%02ld", t / 60, t % 60);
    return b;
}

std::string bytes(std::uintmax_t n)
{
    char b[32];
    if (n >= (1u << 30)) std::snprintf(b, sizeof b, "%.2f GB", n / 1073741824.0);
    else if (n >= (1u << 20)) std::snprintf(b, sizeof b, "%.1f MB", n / 1048576.0);
    else std::snprintf(b, sizeof b, "%ju kB", n / 1024);
    return b;
}

const char* stateWord(SceneState s)
{
    switch (s) {
    case SceneState::Waiting: return "waiting";
    case SceneState::Running: return "running";
    case SceneState::Succeeded: return "done";
    case SceneState::Failed: return "FAILED";
    case SceneState::Stopped: return "stopped";
    }
    return "";
}

/// Progress: one line per scene, redrawn in place on a terminal; on other output one line at
/// each step change and every tenth of a step.
class Progress {
public:
    Progress(const std::vector<std::unique_ptr<Scene>>& theScenes, bool theTerminal)
        : mScenes(theScenes), mTerminal(theTerminal), mLast(theScenes.size()) {}

    void show()
    {
        if (mTerminal) {
            if (mDrawn) std::printf("\033[%zuA", mScenes.size());
            for (const auto& s : mScenes) std::printf("\r\033[2K%s\n", line(*s).c_str());
            mDrawn = true;
        } else {
            for (std::size_t i = 0; i < mScenes.size(); ++i) {
                const Scene& s = *mScenes[i];
                if (s.result().mState != SceneState::Running || s.stepTitle().empty() || s.stepTitle() == "waiting") continue;
                const std::string aKey = s.stepTitle() + "/" + std::to_string(s.percent() / 10);
                if (aKey == mLast[i]) continue;
                mLast[i] = aKey;
                std::printf("%s: %s %d %% (elapsed %s)\n", s.name().c_str(), s.stepTitle().c_str(), s.percent(),
                            clock(s.elapsed()).c_str());
            }
        }
        std::fflush(stdout);
    }

    void ended(const Scene& s)
    {
        if (!mTerminal) std::printf("%s: %s after %s\n", s.name().c_str(), stateWord(s.result().mState), clock(s.result().mSeconds).c_str());
    }

private:
    static std::string line(const Scene& s)
    {
        const SceneResult& r = s.result();
        char b[512];
        if (r.mState == SceneState::Running && !s.stepTitle().empty() && s.stepTitle() != "waiting") {
            const double aStep = s.stepElapsed();
            const double aLeft = s.percent() > 0 ? aStep * (100 - s.percent()) / s.percent() : -1.0;
            std::snprintf(b, sizeof b, "%-24.24s %-40.40s %3d %%  elapsed %s  step left %s", s.name().c_str(),
                          s.stepTitle().c_str(), s.percent(), clock(s.elapsed()).c_str(), clock(aLeft).c_str());
        } else {
            std::snprintf(b, sizeof b, "%-24.24s %s%s", s.name().c_str(), stateWord(r.mState),
                          r.mState == SceneState::Waiting ? "" : ("  " + clock(r.mSeconds)).c_str());
        }
        return b;
    }

    const std::vector<std::unique_ptr<Scene>>& mScenes;
    bool mTerminal;
    bool mDrawn = false;
    std::vector<std::string> mLast;
};

/// The scenes of the inputs: one per raw product, one per product of each archive (read here to
/// learn its products' names and records; the import itself runs in each scene's process).
std::vector<std::unique_ptr<Scene>> makeScenes(const Options& o, const fs::path& theDriver, const fs::path& theImporter,
                                               const fs::path& theConfig)
{
    std::vector<std::unique_ptr<Scene>> aScenes;
    std::set<std::string> aNames;
    auto add = [&](SceneInput theInput) {
        aScenes.push_back(std::make_unique<Scene>(o, theInput, theDriver, theImporter, theConfig));
        if (!aNames.insert(theInput.mName).second)
            aScenes.back()->failBeforeStart(CQORV_ERR_IMPORT_OPTION, "another input gives the products " + theInput.mName +
                                                                         ": focus it into another --out directory");
    };
    for (const fs::path& r : o.mRaw) {
        if (isRawProduct(r)) {
            add(SceneInput{r, {}, sceneBase(r), {}, 0, 0});
            continue;
        }
        CImportRequest q;
        q.mInput = r;
        q.mOrbitFile = o.mOrbit;
        q.mAuxFile = o.mAux;
        q.mWrite = false;
        try {
            const CImportReport aReport = fqorvImport(q);
            // Each scene imports its own product: from the file that holds it alone (an ALOS image
            // file of one polarisation), and only its records when that file holds several.
            for (const CImportedProduct& p : aReport.mProducts) {
                const bool aSeveral = std::count_if(aReport.mProducts.begin(), aReport.mProducts.end(),
                                                    [&](const CImportedProduct& x) { return x.mInput == p.mInput; }) > 1;
                add(SceneInput{{}, fs::absolute(p.mInput), p.mName, aReport.mFormat, p.mFirstRecord,
                               aSeveral ? p.mLastRecord - p.mFirstRecord + 1 : 0});
            }
        } catch (const CImportFailure& e) {
            SceneInput aInput{{}, r, r.filename().string(), "", 0, 0};
            aScenes.push_back(std::make_unique<Scene>(o, aInput, theDriver, theImporter, theConfig));
            aScenes.back()->failBeforeStart(e.id(), std::string("import: ") + e.parameter());
        }
    }
    return aScenes;
}

void printSummary(const std::vector<std::unique_ptr<Scene>>& theScenes)
{
    for (const auto& s : theScenes) {
        const SceneResult& r = s->result();
        std::printf("\n== %s (%s): %s in %s\n", s->name().c_str(), s->source().c_str(), stateWord(r.mState), clock(r.mSeconds).c_str());
        if (r.mState != SceneState::Succeeded)
            std::printf("   failure %ld: %s\n", r.mFailureId, r.mFailureText.c_str());
        for (const std::string& n : r.mImportNotes) std::printf("   import: %s\n", n.c_str());
        for (const std::string& w : r.mWarnings) std::printf("   warning %s\n", w.c_str());
        for (const Product& p : r.mProducts) std::printf("   %-60s %s\n", p.mPath.c_str(), bytes(p.mBytes).c_str());
        if (r.mDoppler) std::printf("   Doppler centroid %.2f Hz\n", *r.mDoppler);
        if (r.mAmbiguity) std::printf("   Doppler ambiguity %d PRF cycles\n", *r.mAmbiguity);
        if (r.mVelocity) std::printf("   processing velocity %.3f m/s\n", *r.mVelocity);
        for (const auto& [aTitle, aSeconds] : r.mSteps) std::printf("   %-44s %8.2f s\n", aTitle.c_str(), aSeconds);
    }
}

CJson summaryJson(const std::vector<std::unique_ptr<Scene>>& theScenes, bool theAllGood)
{
    CJson j = CJson::object();
    j["all_succeeded"] = theAllGood;
    CJson& aList = j["scenes"] = CJson::array();
    for (const auto& s : theScenes) {
        const SceneResult& r = s->result();
        CJson o = CJson::object();
        o["name"] = s->name();
        o["raw"] = s->localRaw().string();
        o["source"] = s->source().string();
        o["source_format"] = s->input().mArchive.empty() ? "raw product" : s->input().mFormat;
        CJson& n = o["import_notes"] = CJson::array();
        for (const std::string& x : r.mImportNotes) n.push(x);
        o["state"] = stateWord(r.mState);
        o["exit_status"] = r.mExitStatus;
        o["failure_id"] = static_cast<long long>(r.mFailureId);
        o["failure_text"] = r.mFailureText;
        o["seconds"] = r.mSeconds;
        o["arguments_file"] = s->argumentsPath().string();
        CJson& w = o["warnings"] = CJson::array();
        for (const std::string& x : r.mWarnings) w.push(x);
        CJson& p = o["products"] = CJson::array();
        for (const Product& q : r.mProducts) {
            CJson x = CJson::object();
            x["path"] = q.mPath.string();
            x["bytes"] = static_cast<long long>(q.mBytes);
            p.push(x);
        }
        o["doppler_hz"] = r.mDoppler ? CJson(*r.mDoppler) : CJson();
        o["ambiguity"] = r.mAmbiguity ? CJson(*r.mAmbiguity) : CJson();
        o["velocity_m_s"] = r.mVelocity ? CJson(*r.mVelocity) : CJson();
        CJson& t = o["steps"] = CJson::array();
        for (const auto& [aTitle, aSeconds] : r.mSteps) {
            CJson x = CJson::object();
            x["title"] = aTitle;
            x["seconds"] = aSeconds;
            t.push(x);
        }
        aList.push(o);
    }
    return j;
}

}  // namespace

int main(int argc, char** argv)
{
    Options o;
    fs::path aConfig;
    const fs::path aExeDir = fs::canonical("/proc/self/exe").parent_path();
    try {
        o = parseOptions(argc, argv);
        if (o.mHelp) {
            std::fputs(helpText().c_str(), stdout);
            return 0;
        }
        aConfig = findConfiguration(o.mConfig, aExeDir);
        setenv("QORVEX_AZIMUTH", o.mAzimuth.c_str(), 1);  // the drivers inherit the azimuth mode
    } catch (const std::exception& e) {
        std::fprintf(stderr, "qorvex-focus: %s\n", e.what());
        return 2;
    }
    const fs::path aDriver = aExeDir / "qorvex";
    const fs::path aImporter = aExeDir / "qorvex-import";

    struct sigaction aAction {};
    aAction.sa_handler = onInterrupt;
    sigemptyset(&aAction.sa_mask);
    sigaction(SIGINT, &aAction, nullptr);
    sigaction(SIGTERM, &aAction, nullptr);

    std::vector<std::unique_ptr<Scene>> aScenes = makeScenes(o, aDriver, aImporter, aConfig);
    Progress aProgress(aScenes, isatty(STDOUT_FILENO) != 0);

    std::size_t aNext = 0;
    int aRunning = 0, aHandled = 0;
    while (true) {
        if (gInterrupts > aHandled) {
            aHandled = gInterrupts;
            for (auto& s : aScenes) {
                if (aHandled == 1) {
                    s->requestStop();
                } else if (s->result().mState == SceneState::Running) {
                    s->kill();
                    --aRunning;
                    aProgress.ended(*s);
                }
            }
            if (aHandled == 1) std::fprintf(stderr, "qorvex-focus: stopping (Ctrl-C again ends at once)\n");
        }
        // Start scenes while there is room; none after an interrupt.
        while (aHandled == 0 && aRunning < o.mJobs && aNext < aScenes.size()) {
            Scene& s = *aScenes[aNext++];
            if (s.result().mState == SceneState::Failed) {
                aProgress.ended(s);
                continue;
            }
            if (!s.prepare()) {
                aProgress.ended(s);
                continue;
            }
            s.start();
            ++aRunning;
        }
        for (auto& s : aScenes) {
            if (s->result().mState != SceneState::Running) continue;
            if (s->poll()) {
                --aRunning;
                aProgress.ended(*s);
            }
        }
        aProgress.show();
        if (aRunning == 0 && (aNext == aScenes.size() || aHandled > 0)) break;
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
    }

    bool aAllGood = true;
    for (const auto& s : aScenes) aAllGood = aAllGood && s->result().mState == SceneState::Succeeded;
    printSummary(aScenes);
    if (!o.mJson.empty()) {
        try {
            summaryJson(aScenes, aAllGood).dumpFile(o.mJson.string());
        } catch (const std::exception& e) {
            std::fprintf(stderr, "qorvex-focus: cannot write %s: %s\n", o.mJson.c_str(), e.what());
            aAllGood = false;
        }
    }
    return aAllGood ? 0 : 1;
}
