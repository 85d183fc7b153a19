// The point-target analysis on SLC files: in process through the library, and the real tool.
#include <cmath>
#include <memory>

#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_irf_slc.h"
#include "qorv_raster_file.h"
#include "qorvex_test_support.h"
#include "test_irf_synthetic.h"
#include "tools_raster_file_exp.h"

namespace {

using namespace irftest;
namespace fs = std::filesystem;

const int kLines = 160;
const int kPixels = 128;

struct Placed {
    const char* mId;
    double mLine, mPixel;
    bool mIsolated;
};
// B's window crosses the top of the image; D is a bright neighbour that is not isolated.
const Placed kTargets[] = {{"A", 50.3, 40.7, true}, {"B", 6.4, 100.5, true}, {"C", 110.6, 90.2, true},
                           {"D", 140.2, 20.3, false}};

/// Writes an ERS-like SLC (azimuth Kaiser x antenna around the centroid, range Kaiser band) with
/// the targets above, as FLOAT_COMPLEX in MSBF order with its .sml header.
void writeSlc(const std::string& theRoot)
{
    CIrfChip aImage(kLines, kPixels, 0, 0);
    for (const Placed& t : kTargets)
        addPointTarget(aImage, t.mLine, t.mPixel, ersAzimuth(), kCentroid / kPrf, ersRange(), 0.0,
                       t.mIsolated ? 100.0f : 300.0f);

    std::unique_ptr<CDescriptionHeader> h = CDescriptionHeader::makeFull();
    (*h)["RasterInfo.NrOfLinesPerImage"].setValue(kLines);
    (*h)["RasterInfo.NrOfPixelsPerLine"].setValue(kPixels);
    (*h)["RasterInfo.CellType"].setValue("FLOAT_COMPLEX");
    (*h)["RasterInfo.DataUnits"].setValue("SLC");
    (*h)["RasterInfo.BytesOrder"].setValue("MSBF");
    for (const char* aKey : {"RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix"})
        (*h)[aKey].setValue(0);
    (*h)["RasterInfo.NullCellValue"].setValue(0.0);
    ASSERT_TRUE(h->write((theRoot + "_hdr").c_str(), true, false));

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(*h, theRoot.c_str(), aParam);
    CRasterFile aFile;
    aFile.openWrite(CQORV_RF_OPEN_WRITE, aParam);
    for (int l = 0; l < kLines; ++l) fqorvWriteLine(aFile, &aImage.at(l, 0), l);
    aFile.close();
}

/// The truth file of that SLC, with extra targets when asked.
std::string truthText(const std::string& theExtraTargets = "")
{
    std::string t = R"({"radar": {"wavelength": 0.0565646, "bandwidth": 15.55e6, "sampling_rate": 18.96e6,
                                  "prf": 1679.9023936391638, "antenna_length": 10.0},
                        "doppler": {"centroid": 310.0},
                        "velocity": {"true_processing_velocity": 7109.517279697725},
                        "orbit": {"state_vectors": {"vel": [[7554.45, 0.0, 0.0]]}},
                        "targets": [)";
    for (const Placed& p : kTargets)
        t += std::string(&p == kTargets ? "" : ",") + "{\"id\": \"" + p.mId +
             "\", \"expected_line\": " + std::to_string(p.mLine) + ", \"expected_pixel\": " +
             std::to_string(p.mPixel) + ", \"isolated\": " + (p.mIsolated ? "true" : "false") + "}";
    return t + theExtraTargets + "]}";
}

class IrfSlc : public testing::Test {
protected:
    void SetUp() override
    {
        mRoot = (mEnv.work() / "scene_slc").string();
        writeSlc(mRoot);
        mTruth = (mEnv.work() / "truth.json").string();
        qtest::writeFile(mTruth, truthText());
    }
    qtest::RunResult runTool(const std::vector<std::string>& theArgs)
    {
        return qtest::runProgram(qtest::binaryDir() / "qorvex_irf", theArgs,
                                 {{"QORVEX_INIT_DIR", (mEnv.work() / "etc").string()}}, mEnv.work(), 60);
    }

    qtest::InProcessEnvironment mEnv;
    std::string mRoot;
    std::string mTruth;
};

}  // namespace

// The tool measures the targets of a file as in memory: positions, figures near the ideal, the
// window that crosses the image edge flagged, non-isolated targets left out on request. Each kind
// of bad input gives exit status 2 and a message naming the problem.
TEST_F(IrfSlc, ToolMeasuresTheTargetsOfAFileAndRefusesBadInput)
{
    const std::string aJson = (mEnv.work() / "report.json").string();
    qtest::RunResult aRun = runTool({"--slc", mRoot, "--truth", mTruth, "--json", aJson, "--only-isolated"});
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    EXPECT_NE(aRun.mStdout.find("measured 3 of 3 targets"), std::string::npos) << aRun.mStdout;
    const CJson j = CJson::parseFile(aJson);
    const CJson& aIdeal = j["ideal"];
    EXPECT_EQ(aIdeal["velocity_source"].string(), "platform");
    ASSERT_EQ(j["targets"].size(), 3u);
    for (const CJson& t : j["targets"].elements()) {
        const std::string aId = t["id"].string();
        SCOPED_TRACE(aId);
        ASSERT_TRUE(t["found"].boolean()) << t["note"].string();
        EXPECT_NEAR(t["line_error"].number(), 0.0, 0.01);
        EXPECT_NEAR(t["pixel_error"].number(), 0.0, 0.01);
        EXPECT_NEAR(t["azimuth_centre_hz"].number(), kCentroid, 30.0);
        EXPECT_EQ(t["touches_edge"].boolean(), aId == "B");
        if (aId == "B") continue;  // the image edge cuts its sidelobes
        for (const auto& [aDir, aPslrDb] : {std::pair{"range", 0.3}, std::pair{"azimuth", 0.5}}) {
            EXPECT_NEAR(t[aDir]["irw"].number(), aIdeal[aDir]["irw"].number(), 0.005) << aDir;
            EXPECT_NEAR(t[aDir]["pslr_db"].number(), aIdeal[aDir]["pslr_db"].number(), aPslrDb) << aDir;
        }
    }
    // The neighbour D sits 30 samples from A: outside A's window, so A is clean.
    const CJson& a = j["targets"].elements()[0];
    EXPECT_NEAR(a["azimuth"]["islr_db"].number(), aIdeal["azimuth"]["islr_db"].number(), 0.2);
    // Its peak amplitude is 100 times the integral of the unit response's spectrum.
    const double aUnitPeak = std::abs(response(1, 0.0, ersAzimuth(), 0.0)[0] * response(1, 0.0, ersRange(), 0.0)[0]);
    EXPECT_NEAR(a["peak_amplitude"].number(), 100.0 * aUnitPeak, 0.1 * aUnitPeak);
    EXPECT_LT(j["summary"]["max_line_error"].number(), 0.01);
    EXPECT_EQ(fqorvIrfAnalyseSlc(mRoot, fqorvIrfReadTruth(mTruth), mTruth, CIrfRunOptions{}).mTargets.size(), 4u);

    const std::string aOutside = (mEnv.work() / "outside.json").string();
    qtest::writeFile(aOutside, truthText(R"(,{"id": "Z", "expected_line": 170.2, "expected_pixel": 10})"));
    const std::string aBroken = (mEnv.work() / "broken.json").string();
    qtest::writeFile(aBroken, R"({"radar": {"wavelength": 0.05)");
    const std::vector<std::pair<std::vector<std::string>, std::string>> aCases = {
        {{"--slc", mRoot, "--truth", aOutside}, "target Z at line 170.200, pixel 10.000 lies outside the image"},
        {{"--slc", mRoot, "--truth", (mEnv.work() / "none.json").string()}, "cannot find the truth file"},
        {{"--slc", mRoot + "_x", "--truth", mTruth}, "cannot find the SLC raster"},
        {{"--slc", mRoot, "--truth", aBroken}, "cannot read the truth file"},
        {{"--slc", mRoot, "--truth", mTruth, "--window", "31"}, "--window must be even"},
        {{"--truth", mTruth}, "--slc and --truth are required"},
        {{"--slc", mRoot, "--truth", mTruth}, "cannot find the SLC header"},  // once the header is gone
    };
    for (const auto& [aArgs, aWords] : aCases) {
        SCOPED_TRACE(aWords);
        if (&aWords == &aCases.back().second) fs::remove(mRoot + ".sml");
        aRun = runTool(aArgs);
        EXPECT_EQ(aRun.mStatus, 2);
        EXPECT_NE(aRun.mStderr.find(aWords), std::string::npos) << aRun.mStderr;
    }
}
