// qorvex_simulate: a physical simulator of stripmap SAR raw echoes that writes the raw products
// the chain reads. See docs/simulator.md and --help.
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <string>
#include <vector>

#include "qorv_envi_util.h"
#include "qorv_enviroment.h"
#include "qorv_sim_options.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_writer.h"

#ifndef QORVEX_SIM_DEFAULT_CONFIG_DIR
#define QORVEX_SIM_DEFAULT_CONFIG_DIR ""
#endif

namespace {

constexpr int CQORV_SIM_EXIT_USAGE = 2;
constexpr int CQORV_SIM_EXIT_FAILED = 1;

/// Brings up the settings the store needs (key files) from Qorvex_configuration.ini: in the
/// directory named by --config, else by QORVEX_INIT_DIR, else in the build tree's etc/.
bool initRuntime(const std::string& theConfigDir)
{
    std::string aDir = theConfigDir;
    if (aDir.empty()) {
        const char* aEnv = std::getenv("QORVEX_INIT_DIR");
        aDir = aEnv && *aEnv ? aEnv : QORVEX_SIM_DEFAULT_CONFIG_DIR;
    }
    if (aDir.empty() || !std::filesystem::exists(std::filesystem::path(aDir) / "Qorvex_configuration.ini")) {
        std::fprintf(stderr,
                     "qorvex_simulate: no Qorvex_configuration.ini in \"%s\": give its directory with --config or "
                     "QORVEX_INIT_DIR\n",
                     aDir.c_str());
        return false;
    }
    setenv("QORVEX_INIT_DIR", aDir.c_str(), 1);
    return fdfInit(false, CQORV_VERSION_TEXT, false);
}

}  // namespace

int main(int argc, char** argv)
{
    const std::vector<std::string> aArgs(argv + 1, argv + argc);
    CSimScene aScene;
    CSimCommand aCommand;
    try {
        fqorvSimParseCommandLine(aArgs, aScene, aCommand);
        if (aCommand.mHelp) {
            std::fputs(fqorvSimUsage().c_str(), stdout);
            return 0;
        }
        fqorvSimCompleteScene(aScene);
    } catch (const std::exception& e) {
        std::fprintf(stderr, "qorvex_simulate: %s\n", e.what());
        return CQORV_SIM_EXIT_USAGE;
    }
    if (!initRuntime(aCommand.mConfigDir)) return CQORV_SIM_EXIT_USAGE;
    fqorvRegisterEnviHeaderWriter();  // the raw raster gets its ENVI header beside the .sml

    try {
        CSimProgress aProgress;
        if (!aCommand.mQuiet)
            aProgress = [](int p) {
                std::fprintf(stderr, "\rqorvex_simulate: %3d%%", p);
                if (p >= 100) std::fputc('\n', stderr);
            };
        const CSimRunReport r = fqorvSimRun(aScene, aCommand.mRoot, aProgress);
        if (aScene.mArchive == CSimArchive::Raw)
            std::printf("raster   %s\nheader   %s\ntruth    %s\n", r.mRaster.c_str(), r.mHeader.c_str(), r.mTruth.c_str());
        else
            std::printf("archive  %s\ntruth    %s\n", r.mRaster.c_str(), r.mTruth.c_str());
        if (aScene.mArchive == CSimArchive::Asar)
            std::printf("outside  %s_ASA_INS_AX %s_DOR_VOR_AX\n", aCommand.mRoot.c_str(), aCommand.mRoot.c_str());
        std::printf("%s: %ld pulses, %ld records x %d samples, %zu targets, %zu scatterers\n",
                    aScene.mRadar.mSensorName.c_str(), r.mPulses, r.mRecords, aScene.mSamples, r.mTargets,
                    r.mScatterers);
        if (aScene.mFormat == CSimSampleFormat::Ubyte5Bit)
            std::printf("%d-bit gain %.4f codes/unit, clipped %.4f%% of components\n", aScene.mCodeBits, r.mGain,
                        100.0 * r.mClippedFraction);
        else
            std::printf("%s, %.4f%% of components beyond the outermost level\n",
                        aScene.mArchive == CSimArchive::Asar ? "FBAQ 8:4" : "4-bit BAQ", 100.0 * r.mClippedFraction);
        std::printf("%.2f s (echoes %.2f s, %d threads)\n", r.mSeconds, r.mEchoSeconds, r.mThreads);
    } catch (const std::exception& e) {
        std::fprintf(stderr, "qorvex_simulate: %s\n", e.what());
        return CQORV_SIM_EXIT_FAILED;
    }
    return 0;
}
