// qorvex_irf: point-target analysis of a focused SLC against a truth file.
//
//   qorvex_irf --slc R_slc --truth T.json [--json out.json] [--az-fraction 0.8] [--window 32]
//              [--upsample 16] [--search 8] [--only-isolated] [--pattern-velocity V]
//
// Prints one row per target and a summary; writes the JSON report when asked. Exit status 0 when
// at least one target was measured, 1 when none was, 2 for bad input (with a message).
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <string>
#include <unistd.h>

#include "qorv_enviroment.h"
#include "qorv_generic_utility.h"
#include "qorv_irf_slc.h"

namespace {

const char* const CQORV_IRF_USAGE =
    "usage: qorvex_irf --slc R_slc --truth T.json [--json out.json] [--az-fraction 0.8] [--window 32]\n"
    "                  [--upsample 16] [--search 8] [--only-isolated] [--pattern-velocity V]\n"
    "  --slc               the SLC raster; its header is R_slc.sml (or R_slc_hdr)\n"
    "  --truth             the truth file of the scene (targets, radar, Doppler, velocity)\n"
    "  --json              write the report as JSON to this file\n"
    "  --az-fraction       processed azimuth bandwidth / PRF (default: the header's\n"
    "                      sar_processing.AzBandWidthFraction, else 0.8)\n"
    "  --window            chip size around each peak, samples (even, 8 to 256; default 32)\n"
    "  --upsample          upsampling factor of the chip (2 to 64; default 16)\n"
    "  --search            the peak is looked for within this many samples of the truth (default 8)\n"
    "  --only-isolated     measure only the targets marked isolated\n"
    "  --pattern-velocity  velocity of the ideal's antenna pattern, m/s (default: the platform's\n"
    "                      speed from the truth's orbit, else its effective velocity)\n"
    "The configuration comes from QORVEX_INIT_DIR (default: the build tree's etc/).\n";

struct CIrfCommandLine {
    std::string mSlc;
    std::string mTruth;
    std::string mJson;
    CIrfRunOptions mRun;
};

[[noreturn]] void badInput(const std::string& theMessage)
{
    std::cerr << "qorvex_irf: " << theMessage << "\n";
    std::exit(2);
}

double numberArgument(const std::string& theOption, const char* theText)
{
    char* aEnd = nullptr;
    errno = 0;
    const double v = std::strtod(theText, &aEnd);
    if (errno != 0 || aEnd == theText || *aEnd != '\0' || !std::isfinite(v))
        badInput(theOption + " wants a number, not \"" + theText + "\"");
    return v;
}

int integerArgument(const std::string& theOption, const char* theText, int theMin, int theMax)
{
    const double v = numberArgument(theOption, theText);
    if (v != std::floor(v) || v < theMin || v > theMax)
        badInput(theOption + " wants a whole number from " + std::to_string(theMin) + " to " +
                 std::to_string(theMax) + ", not \"" + theText + "\"");
    return static_cast<int>(v);
}

CIrfCommandLine parseCommandLine(int argc, char** argv)
{
    CIrfCommandLine c;
    for (int i = 1; i < argc; ++i) {
        const std::string a = argv[i];
        if (a == "-h" || a == "--help") {
            std::cout << CQORV_IRF_USAGE;
            std::exit(0);
        }
        if (a == "--only-isolated") {
            c.mRun.mOnlyIsolated = true;
            continue;
        }
        if (i + 1 >= argc) badInput(a == "--slc" || a == "--truth" ? a + " wants a value" : "unknown option " + a);
        const char* v = argv[++i];
        if (a == "--slc") c.mSlc = v;
        else if (a == "--truth") c.mTruth = v;
        else if (a == "--json") c.mJson = v;
        else if (a == "--az-fraction") {
            c.mRun.mAzFraction = numberArgument(a, v);
            if (c.mRun.mAzFraction <= 0.0 || c.mRun.mAzFraction > 1.0) badInput("--az-fraction must lie in (0, 1]");
        }
        else if (a == "--window") c.mRun.mMeasure.mWindow = integerArgument(a, v, 8, 256);
        else if (a == "--upsample") c.mRun.mMeasure.mUpsample = integerArgument(a, v, 2, 64);
        else if (a == "--search") c.mRun.mMeasure.mSearch = integerArgument(a, v, 0, 256);
        else if (a == "--pattern-velocity") c.mRun.mPatternVelocity = numberArgument(a, v);
        else badInput("unknown option " + a + "\n" + CQORV_IRF_USAGE);
    }
    if (c.mSlc.empty() || c.mTruth.empty()) badInput(std::string("--slc and --truth are required\n") + CQORV_IRF_USAGE);
    if (c.mRun.mMeasure.mWindow % 2 != 0) badInput("--window must be even");
    if (c.mRun.mPatternVelocity < 0.0) badInput("--pattern-velocity must be positive");
    return c;
}

/// Brings up the settings that the header store needs, without trace, log or working file of its
/// own, so that a run of the tool never touches a chain's working file.
void startRuntime()
{
    const char* aInit = std::getenv("QORVEX_INIT_DIR");
    if (aInit == nullptr || *aInit == '\0') ::setenv("QORVEX_INIT_DIR", QORVEX_IRF_DEFAULT_INIT_DIR, 1);
    const std::string aConfiguration = fdfNormaliseDirectory(std::getenv("QORVEX_INIT_DIR")) + "Qorvex_configuration.ini";
    if (!fqorvFileExists(aConfiguration))
        badInput("no configuration " + aConfiguration + ": set QORVEX_INIT_DIR to the directory of Qorvex_configuration.ini");
    const char* aWorking = std::getenv("QORVEX_WORKING_FILE");
    if (aWorking == nullptr || *aWorking == '\0') {
        const std::string aPrivate = "/tmp/qorvex_irf_" + std::to_string(::getpid()) + ".working";
        ::setenv("QORVEX_WORKING_FILE", aPrivate.c_str(), 1);
    }
    fdfInit(false, CQORV_VERSION_TEXT, false);
}

}  // namespace

int main(int argc, char** argv)
{
    const CIrfCommandLine c = parseCommandLine(argc, argv);
    if (!fqorvFileExists(c.mSlc)) badInput("cannot find the SLC raster " + c.mSlc);
    if (!fqorvFileExists(c.mSlc + ".sml") && !fqorvFileExists(c.mSlc + "_hdr"))
        badInput("cannot find the SLC header " + c.mSlc + ".sml (or " + c.mSlc + "_hdr)");
    if (!fqorvFileExists(c.mTruth)) badInput("cannot find the truth file " + c.mTruth);

    CIrfTruth aTruth;
    try {
        aTruth = fqorvIrfReadTruth(c.mTruth);
    } catch (const std::exception& e) {
        badInput(e.what());
    }

    startRuntime();
    CIrfReport aReport;
    try {
        aReport = fqorvIrfAnalyseSlc(c.mSlc, aTruth, c.mTruth, c.mRun);
    } catch (const CIrfInputError& e) {
        badInput(e.what());
    }

    std::cout << fqorvIrfFormatTable(aReport);
    if (!c.mJson.empty()) {
        try {
            fqorvIrfReportJson(aReport).dumpFile(c.mJson);
        } catch (const std::exception& e) {
            std::cerr << "qorvex_irf: cannot write " << c.mJson << ": " << e.what() << "\n";
            return 1;
        }
    }
    return fqorvIrfSummarise(aReport).mMeasured > 0 ? 0 : 1;
}
