// The Doppler centroid estimator on clutter of known spectrum (complex Gaussian noise filtered in
// azimuth by a band centred on a chosen centroid): the table must give the centroid back, modulo
// the PRF, anywhere in the band. Then step 1 through the driver on simulated ERS and ENVISAT scenes.
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <fstream>
#include <random>
#include <vector>

#include "qorv_description_section.h"
#include "qorv_doppler_estimation.h"
#include "qorv_json.h"
#include "qorv_raster_file.h"
#include "qorv_read_write_info.h"
#include "qorvex_test_support.h"
#include "tools_raster_file_exp.h"

namespace {

namespace fs = std::filesystem;

constexpr int kLines = 1024, kSamples = 1024, kTaps = 16;

/// Writes theRoot as FLOAT_COMPLEX clutter whose azimuth spectrum is a Hann band centred on
/// theCentroid (Hz), into the header of a simulated scene.
void fWriteClutter(const fs::path& theRoot, double theCentroid, double thePrf)
{
    auto h = CDescriptionHeader::makeFull();
    ASSERT_TRUE(h->read((theRoot.string() + "_hdr").c_str(), true));
    (*h)["RasterInfo.CellType"].setValue("FLOAT_COMPLEX");
    (*h)["RasterInfo.RowPrefix"].setValue(0);
    (*h)["RasterInfo.NrOfPixelsPerLine"].setValue(kSamples);
    (*h)["RasterInfo.NrOfLinesPerImage"].setValue(kLines);
    ASSERT_TRUE(h->write((theRoot.string() + "_hdr").c_str(), true, false));
    CRasterFileParam p;
    fqorvRasterParamFromHeader(*h, theRoot.c_str(), p);
    CRasterFile f;
    f.openWrite(CQORV_RF_OPEN_WRITE, p);

    std::vector<std::complex<double>> aTaps(kTaps);
    for (int k = 0; k < kTaps; ++k)
        aTaps[k] = std::polar(0.5 - 0.5 * std::cos(2.0 * M_PI * (k + 0.5) / kTaps), 2.0 * M_PI * theCentroid * k / thePrf);
    std::mt19937 aRandom(7);
    std::normal_distribution<double> aGauss;
    std::vector<std::vector<std::complex<double>>> aNoise(kTaps, std::vector<std::complex<double>>(kSamples));
    std::vector<fcomplex> aLine(kSamples);
    for (int l = 0; l < kLines + kTaps; ++l) {
        std::vector<std::complex<double>>& aNew = aNoise[static_cast<std::size_t>(l % kTaps)];
        for (auto& z : aNew) z = {aGauss(aRandom), aGauss(aRandom)};
        if (l < kTaps) continue;
        for (int s = 0; s < kSamples; ++s) {
            std::complex<double> v;
            for (int k = 0; k < kTaps; ++k) v += aTaps[k] * aNoise[static_cast<std::size_t>((l - k) % kTaps)][s];
            aLine[s] = fcomplex(static_cast<float>(v.real()), static_cast<float>(v.imag()));
        }
        fqorvWriteLine(f, aLine.data(), l - kTaps);
    }
    f.close();
}

TEST(DopplerEstimation, TheTableGivesTheCentroidBackAcrossTheBand)
{
    qtest::DriverSandbox aBox;
    const fs::path aRoot = aBox.data() / "clutter";
    const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", "256", "--samples", "1024", "--targets", "grid:1x1",
                                             "--quiet", "--out", aRoot.string(), "--config", aBox.etc().string()};
    ASSERT_EQ(qtest::runProgram(qtest::binaryDir() / "qorvex_simulate", aScene, {}, aBox.data()).mStatus, 0);
    qtest::InProcessEnvironment aEnv;
    const double aPrf = [&] {
        auto h = CDescriptionHeader::makeFull();
        EXPECT_TRUE(h->read((aRoot.string() + "_hdr").c_str(), true));
        return (*h)["ChannelInfo.PRF"].getDouble(0);
    }();
    for (const double aFraction : {-0.45, -0.2, 0.0, 0.17, 0.31, 0.45}) {
        SCOPED_TRACE(aFraction);
        fWriteClutter(aRoot, aFraction * aPrf, aPrf);
        ASSERT_TRUE(fdfEstimateDoppler(aRoot.c_str(), 1, 0, 50, false));
        YDF_SAR aSar;
        read_image_info(aRoot.c_str(), aSar);
        ASSERT_TRUE(aSar.mDopplerTableEstimated);
        for (const double aLine : {200.0, 512.0, 800.0}) {
            const double aError = std::remainder(aSar.getDopplerFromPixel(kSamples / 2, aLine, false, false) - aFraction * aPrf, aPrf);
            EXPECT_LT(std::fabs(aError), 0.005 * aPrf) << "line " << aLine;
        }
    }
}

TEST(DopplerEstimation, StepOneFindsTheCentroidOfSimulatedErsAndEnvisatScenes)
{
    // Clutter beyond both ends of the image, so that the first and last lines see scatterers on
    // both sides of the beam, as a cut from a longer pass does.
    for (const char* aPreset : {"ers2", "envisat"}) {
        SCOPED_TRACE(aPreset);
        qtest::DriverSandbox aBox;
        const fs::path aRaw = aBox.data() / "scene_raw";
        const std::vector<std::string> aScene = {"--preset", aPreset, "--lines", "4096", "--samples", "1024", "--targets",
                                                 "grid:2x2", "--scatterers", "6000", "--scatterer-rms", "0.5",
                                                 "--scatterer-margin", "1300", "--quiet", "--out", aRaw.string(), "--config",
                                                 aBox.etc().string()};
        ASSERT_EQ(qtest::runProgram(qtest::binaryDir() / "qorvex_simulate", aScene, {}, aBox.data()).mStatus, 0);
        auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, aBox.data() / "scene_slc");
        aArgs[17] = "OK";  // no autofocus: steps 0, 1, 2 and 5
        const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 600);
        ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr << qtest::readFile(aBox.workingFile());
        EXPECT_TRUE(fs::exists(aBox.data() / "scene_slc"));
        EXPECT_FALSE(fs::exists(aBox.data() / "scene_azsp"));

        const CJson aTruth = CJson::parseFile(aRaw.string() + "_truth.json");
        const double aPrf = aTruth["radar"]["prf"].number(), aCentroid = aTruth["doppler"]["centroid"].number();
        qtest::InProcessEnvironment aEnv;
        YDF_SAR aSar;
        read_image_info(aRaw.c_str(), aSar);
        ASSERT_TRUE(aSar.mDopplerTableEstimated);
        for (const double aLine : {1024.0, 2048.0, 3072.0})
            EXPECT_LT(std::fabs(aSar.getDopplerFromPixel(512, aLine, false, false) - aCentroid), 0.005 * aPrf) << "line " << aLine;
    }
}

/// Sets every echo sample of a simulated ERS raw file (records of a 412-byte prefix and two bytes
/// per sample) to one code: a scene without energy whose line counters still run.
void fBlankEchoes(const fs::path& theRaw, int theLines, int theSamples)
{
    std::fstream f(theRaw, std::ios::in | std::ios::out | std::ios::binary);
    const std::string aBlank(2 * static_cast<std::size_t>(theSamples), '\x10');
    for (int l = 0; l < theLines; ++l) {
        f.seekp(static_cast<std::streamoff>(l) * (412 + 2 * theSamples) + 412);
        f.write(aBlank.data(), static_cast<std::streamsize>(aBlank.size()));
    }
    ASSERT_TRUE(f.good());
}

TEST(DopplerEstimation, DataThatGiveNoEstimateFailStepOneAndKeepTheHeadersDoppler)
{
    struct Case {
        const char* mName;
        int mLines;
        const char* mAzDegree;
        bool mBlank;
        const char* mWords;
    };
    for (const Case& c : {Case{"no energy", 256, "1", true, "carry no energy"},
                          Case{"too few lines", 24, "1", false, "24 lines are too few"},
                          Case{"unfittable degree", 256, "12", false, "azimuth polynomial of degree 12"}}) {
        SCOPED_TRACE(c.mName);
        qtest::DriverSandbox aBox;
        const fs::path aRaw = aBox.data() / "scene_raw";
        const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", std::to_string(c.mLines), "--samples", "768",
                                                 "--scatterers", "500", "--write-doppler", "--quiet", "--out",
                                                 aRaw.string(), "--config", aBox.etc().string()};
        ASSERT_EQ(qtest::runProgram(qtest::binaryDir() / "qorvex_simulate", aScene, {}, aBox.data()).mStatus, 0);
        if (c.mBlank) fBlankEchoes(aRaw, c.mLines, 768);
        auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, aBox.data() / "scene_slc");
        aArgs[17] = "OK";  // steps 0, 1, 2 and 5
        aArgs.push_back(c.mAzDegree);
        const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 300);
        EXPECT_NE(aRun.mStatus, 0);
        EXPECT_EQ(aRun.mExitId, 261121);
        std::string aError = qtest::readFile(aBox.workingFile().string() + "_error");
        std::erase(aError, '\n');  // the parameter is folded over lines
        EXPECT_NE(aError.find(c.mWords), std::string::npos) << aError;
        EXPECT_FALSE(fs::exists(aBox.data() / "scene_rc"));
        EXPECT_FALSE(fs::exists(aBox.data() / "scene_slc"));

        qtest::InProcessEnvironment aEnv;
        YDF_SAR aSar;
        read_image_info(aRaw.c_str(), aSar);
        EXPECT_FALSE(aSar.mDopplerTableEstimated);
        const CJson aTruth = CJson::parseFile(aRaw.string() + "_truth.json");
        EXPECT_NEAR(aSar.getDopplerFromPixel(384, 0, false, false), aTruth["doppler"]["centroid"].number(), 1e-6);
    }
}

TEST(DopplerEstimation, AHeaderWithoutDopplerIsFocusedAtZeroWithAWarning)
{
    qtest::DriverSandbox aBox;
    const fs::path aRaw = aBox.data() / "scene_raw";
    const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", "256", "--samples", "768", "--targets", "grid:1x1",
                                             "--quiet", "--out", aRaw.string(), "--config", aBox.etc().string()};
    ASSERT_EQ(qtest::runProgram(qtest::binaryDir() / "qorvex_simulate", aScene, {}, aBox.data()).mStatus, 0);
    auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, aBox.data() / "scene_slc");
    aArgs[15] = aArgs[17] = "OK";  // steps 0, 2 and 5
    const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 300);
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    EXPECT_NE(qtest::readFile(aBox.work() / "Process.log").find("the raw header holds no Doppler centroid, 0 Hz is used"),
              std::string::npos);
}

}  // namespace
