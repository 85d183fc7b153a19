// The chain's products read by an outside client: a simulated ERS scene through steps 0, 2, 5, 6
// and 7, then step 8 on the SLC; GDAL opens the SLC and the power image through their ENVI headers
// and both TIFFs, and its sizes, types and pixel values agree with what the chain wrote. Then the
// operator's stop in each long step.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "qorv_az_SLC.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_multi_SLC.h"
#include "qorv_pre_rc.h"
#include "qorv_raster_file.h"
#include "qorvex_test_support.h"
#include "tools_raster_file_exp.h"

namespace {

namespace fs = std::filesystem;

std::string fGdal(const char* theProgram, const std::vector<std::string>& theArgs)
{
    const qtest::RunResult r = qtest::runProgram(fs::path("/usr/bin") / theProgram, theArgs, {}, fs::temp_directory_path());
    EXPECT_EQ(r.mStatus, 0) << r.mStderr;
    return r.mStdout;
}

/// Width, lines, one pixel (line, pixel) and the mean power of a raster of the chain, read with
/// the project's code.
struct CRasterSample {
    int mPixels = 0, mLines = 0;
    fcomplex mValue;
    double mMeanPower = 0.0;
};

CRasterSample fReadOwn(const fs::path& theRaster, int theLine, int thePixel)
{
    qtest::InProcessEnvironment aEnv;
    auto h = CDescriptionHeader::makeFull();
    EXPECT_TRUE(h->read((theRaster.string() + "_hdr").c_str(), true));
    CRasterFileParam p;
    fqorvRasterParamFromHeader(*h, theRaster.c_str(), p);
    CRasterFile f;
    f.openRead(p);
    std::vector<fcomplex> aLine(static_cast<std::size_t>(p.mNrOfPixelsPerLine));
    CRasterSample r{p.mNrOfPixelsPerLine, p.mNrOfLinesPerImage, {}, 0.0};
    for (int l = 0; l < r.mLines; ++l) {
        fqorvReadLine(f, aLine.data(), l);
        for (const fcomplex& z : aLine) r.mMeanPower += std::norm(z);
        if (l == theLine) r.mValue = aLine[static_cast<std::size_t>(thePixel)];
    }
    r.mMeanPower /= static_cast<double>(r.mLines) * r.mPixels;
    return r;
}

TEST(ChainProducts, GdalReadsEveryProductAsTheChainWroteIt)
{
    qtest::DriverSandbox aBox;
    const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", "3072", "--samples", "1280", "--targets", "grid:2x2",
                                             "--write-doppler"};
    ASSERT_EQ(aBox.simulate((aBox.data() / "scene_raw").string(), aScene).mStatus, 0);
    auto aArgs = qtest::DriverSandbox::defaultArguments(aBox.data() / "scene_raw", aBox.data() / "scene_slc");
    aArgs[5] = aArgs[6] = "OK";    // multi-look and TIFF
    aArgs[15] = aArgs[17] = "OK";  // no Doppler estimation, no autofocus
    qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 600);
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr << qtest::readFile(aBox.workingFile());
    auto aSlcArgs = qtest::DriverSandbox::defaultArguments(aBox.data() / "scene_slc", aBox.data() / "scene_pwr");
    aSlcArgs[1] = "NotOK";
    aSlcArgs[6] = aSlcArgs[14] = aSlcArgs[15] = aSlcArgs[16] = aSlcArgs[17] = "OK";
    aRun = aBox.run(aBox.writeArguments(aSlcArgs, "args_slc_tiff.txt"), {}, 600);
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr;

    // The SLC's TIFF keeps every cell; the power image's is sized toward square: 928 x 614 cells
    // become 464 x 614 pixels of 2 x 1 cells.
    struct CProduct {
        const char* mName;
        const char* mType;
        int mTiffColumnWindow;
    };
    for (const CProduct& c : {CProduct{"scene_slc", "CFloat32", 1}, CProduct{"scene_pwr", "Float32", 2}}) {
        SCOPED_TRACE(c.mName);
        const fs::path aRaster = aBox.data() / c.mName;
        const CRasterSample aOwn = fReadOwn(aRaster, 200, 300);
        const std::string aInfo = fGdal("gdalinfo", {aRaster.string()});
        EXPECT_NE(aInfo.find("Driver: ENVI/"), std::string::npos) << aInfo;
        EXPECT_NE(aInfo.find("Size is " + std::to_string(aOwn.mPixels) + ", " + std::to_string(aOwn.mLines)), std::string::npos) << aInfo;
        EXPECT_NE(aInfo.find("Type=" + std::string(c.mType)), std::string::npos) << aInfo;
        const std::string aValue = fGdal("gdallocationinfo", {"-valonly", aRaster.string(), "300", "200"});
        if (c.mType[0] == 'C') {
            // Normalised to a mean amplitude of sqrt(16000) in the central window: for a
            // speckle-like image the mean power is 4 / pi of its square.
            EXPECT_GT(aOwn.mMeanPower, 0.8 * 16000.0);
            EXPECT_LT(aOwn.mMeanPower, 1.6 * 16000.0);
            float aRe = 0.0f, aIm = 0.0f;
            ASSERT_EQ(std::sscanf(aValue.c_str(), "%f%f", &aRe, &aIm), 2) << aValue;
            EXPECT_FLOAT_EQ(aRe, aOwn.mValue.real());
            EXPECT_FLOAT_EQ(aIm, aOwn.mValue.imag());
        } else {
            EXPECT_FLOAT_EQ(std::strtof(aValue.c_str(), nullptr), aOwn.mValue.real());
        }
        const std::string aTiff = fGdal("gdalinfo", {"-stats", aRaster.string() + ".tif"});
        EXPECT_NE(aTiff.find("Driver: GTiff/"), std::string::npos) << aTiff;
        const std::string aTiffSize = std::to_string(aOwn.mPixels / c.mTiffColumnWindow) + ", " + std::to_string(aOwn.mLines);
        EXPECT_NE(aTiff.find("Size is " + aTiffSize), std::string::npos) << aTiff;
        EXPECT_NE(aTiff.find("Type=Byte"), std::string::npos) << aTiff;
        EXPECT_NE(aTiff.find("STATISTICS_MAXIMUM=255"), std::string::npos) << aTiff;
    }
}

TEST(ChainProducts, TheOperatorsStopEndsEachLongStepWithoutAProduct)
{
    qtest::DriverSandbox aBox;
    const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", "2048", "--samples", "1024", "--targets", "grid:1x1",
                                             "--write-doppler"};
    ASSERT_EQ(aBox.simulate((aBox.data() / "scene_raw").string(), aScene).mStatus, 0);
    auto aArgs = qtest::DriverSandbox::defaultArguments(aBox.data() / "scene_raw", aBox.data() / "scene_slc");
    aArgs[5] = "OK";
    aArgs[15] = aArgs[17] = "OK";
    ASSERT_EQ(aBox.run(aBox.writeArguments(aArgs), {}, 600).mStatus, 0);

    const std::string d = aBox.data().string() + "/";
    const std::vector<std::vector<std::string>> aSteps = {
        {"range compression", d + "scene_raw", d + "stop_rc", d + "scene_par"},
        {"SAR azimuth omega/k processor", d + "scene_rc", d + "stop_slc", d + "scene_par", "1", "1", "8192", "0", "0"},
        {"multi look", d + "scene_slc", d + "stop_pwr", d + "scene_par", "1", "5", "0", "NotOK", "NotOK", "NotOK"}};
    const std::vector<int (*)(int, char**)> aRun = {qorv_pre_rc, qorv_az_SLC, qorv_multi_SLC};
    for (std::size_t k = 0; k < aSteps.size(); ++k) {
        SCOPED_TRACE(aSteps[k][0]);
        qtest::InProcessEnvironment aEnv;
        qtest::writeFile(gWorkingFile, "101\nstop\n");
        std::vector<std::string> a = aSteps[k];
        std::vector<char*> aArgv;
        for (std::string& x : a) aArgv.push_back(x.data());
        EXPECT_QORV_FAILURE(aRun[k](static_cast<int>(aArgv.size()), aArgv.data()), 326400);
        EXPECT_FALSE(fs::exists(a[2]));
        EXPECT_FALSE(fs::exists(a[2] + ".sml"));
    }
}

/// How many times theText stands in theTrace.
std::size_t fCount(const std::string& theTrace, const std::string& theText)
{
    std::size_t n = 0;
    for (std::size_t at = theTrace.find(theText); at != std::string::npos; at = theTrace.find(theText, at + 1)) ++n;
    return n;
}

TEST(ChainProducts, AListOfProductsTakesTheEstimatesOfItsFirstProductAndStopsAtAMissingOne)
{
    qtest::DriverSandbox aBox;
    const fs::path aScene = aBox.data() / "scene";
    const std::vector<std::string> aArgsSim = {"--preset", "ers2", "--lines", "2048", "--samples", "1024", "--targets", "grid:2x2",
                                               "--scatterers", "3000", "--scatterer-rms", "0.3", "--scatterer-margin", "1300",
                                               "--velocity-error", "0.01"};
    ASSERT_EQ(aBox.simulate(aScene.string(), aArgsSim).mStatus, 0);
    std::string aList;
    for (const char* aName : {"a_raw", "b_raw"}) {
        fs::copy_file(aScene, aBox.data() / aName);
        fs::copy_file(aScene.string() + ".sml", (aBox.data() / aName).string() + ".sml");
        aList += (aBox.data() / aName).string() + "\n";
    }
    // A third entry names a product that is not there: the run ends with the missing file's id
    // once the two good products are made.
    qtest::writeFile(aBox.data() / "scenes_foc.list", aList + (aBox.data() / "c_raw").string() + "\n");
    auto aArgs = qtest::DriverSandbox::defaultArguments(aBox.data() / "scenes_foc.list", aBox.data() / "unused");
    aArgs[10] = "OK";  // the whole chain for the first product, steps 0, 2 and 5 for the second
    aArgs.push_back("0");
    const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 600);
    ASSERT_EQ(aRun.mExitId, 261122) << aRun.mStderr << qtest::readFile(aBox.workingFile());
    EXPECT_NE(aRun.mStatus, 0);
    EXPECT_TRUE(fs::exists(aBox.data() / "a_slc"));
    EXPECT_TRUE(fs::exists(aBox.data() / "b_slc"));
    for (const char* aName : {"c_par.sml", "c_rc", "c_slc"}) EXPECT_FALSE(fs::exists(aBox.data() / aName)) << aName;
    const std::string aTrace = qtest::readFile(aBox.work() / "Process.trace");
    EXPECT_EQ(fCount(aTrace, "*** SAR IQ raw data azimuth spectrum"), 1u);
    EXPECT_EQ(fCount(aTrace, "*** SAR Doppler ambiguity resolver"), 1u);
    EXPECT_EQ(fCount(aTrace, "*** SAR autofocus"), 3u);
    EXPECT_EQ(fCount(aTrace, "*** SAR azimuth omega/k processor"), 2u);

    qtest::InProcessEnvironment aEnv;
    auto aRcA = CDescriptionHeader::makeFull(), aRcB = CDescriptionHeader::makeFull();
    ASSERT_TRUE(aRcA->read((aBox.data() / "a_rc_hdr").c_str(), true));
    ASSERT_TRUE(aRcB->read((aBox.data() / "b_rc_hdr").c_str(), true));
    EXPECT_DOUBLE_EQ(aRcB->getField("Processing.DopCenRangeCoeff").getDouble(0, 2),
                     aRcA->getField("Processing.DopCenRangeCoeff").getDouble(0, 2));
    CDescriptionHeader aParA({"sar_processing"}), aParB({"sar_processing"});
    ASSERT_TRUE(aParA.read((aBox.data() / "a_par").c_str(), true));
    ASSERT_TRUE(aParB.read((aBox.data() / "b_par").c_str(), true));
    EXPECT_DOUBLE_EQ(aParB["sar_processing.Velocity"].getDouble(), aParA["sar_processing.Velocity"].getDouble());
}

}  // namespace
