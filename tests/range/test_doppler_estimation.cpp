// The Doppler centroid estimator on clutter of known spectrum (complex Gaussian noise filtered in
// azimuth by a band centred on a chosen centroid): the table must give the centroid back, modulo
// the PRF, anywhere in the band. Then the whole chain on simulated ERS, ENVISAT and ALOS scenes, and
// the data that give no estimate.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <random>
#include <vector>

#include "qorv_description_section.h"
#include "qorv_doppler_estimation.h"
#include "qorv_json.h"
#include "qorv_raster_file.h"
#include "qorv_read_write_info.h"
#include "qorvex_irf_check.h"
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
    const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", "256", "--samples", "1024", "--targets", "grid:1x1"};
    ASSERT_EQ(aBox.simulate(aRoot.string(), aScene).mStatus, 0);
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

TEST(DopplerEstimation, TheWholeChainFromRawDataAndHeaderAloneFindsDopplerAndVelocity)
{
    // Scenes of 4,096 lines in clutter take minutes under the sanitizers; the smaller tests cover
    // the same code there.
#if defined(__SANITIZE_ADDRESS__)
    GTEST_SKIP() << "accuracy on full-size clutter scenes: release suite";
#endif
    // Clutter beyond both ends of the image (a margin of the aperture), so that the first and last
    // lines see scatterers on both sides of the beam, as a cut from a longer pass does. ALOS keeps
    // its antenna pattern to the first null: to the second, its aperture of 7,200 lines makes the
    // scene too slow to simulate here.
    struct Case {
        const char* mPreset;
        const char* mCentroid;  // "" for the preset's own
        const char* mVelocityError;
        const char* mExtent;
        const char* mMargin;
        const char* mScatterers;
        bool mLongAperture;  // the clutter scene is shorter than the aperture: autofocus runs on
                             // the clean scene, of 8,192 lines
        double mAzimuthPslrDb;
    };
    for (const Case& c : {Case{"ers2", "-336", "0.01", "2", "1300", "6000", false, 1.5},
                          Case{"envisat", "330", "-0.01", "2", "1300", "6000", false, 1.5},
                          Case{"alos", "", "0.01", "1", "3700", "10000", true, 4.0}}) {
        SCOPED_TRACE(c.mPreset);
        qtest::DriverSandbox aBox;
        const fs::path aRaw = aBox.data() / "scene_raw";
        std::vector<std::string> aScene = {"--preset", c.mPreset, "--lines", "4096", "--samples", "1024", "--targets",
                                           "grid:2x2", "--scatterers", c.mScatterers, "--scatterer-rms", "0.3",
                                           "--scatterer-margin", c.mMargin, "--pattern-extent", c.mExtent,
                                           "--velocity-error", c.mVelocityError};
        if (*c.mCentroid) aScene.insert(aScene.end(), {"--doppler-centroid", c.mCentroid});
        ASSERT_EQ(aBox.simulate(aRaw.string(), aScene).mStatus, 0);
        auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, aBox.data() / "scene_slc");
        aArgs[10] = "OK";        // steps 0, 1, 2, 4, 3, 3, 3 and 5
        aArgs.push_back("0");    // one centroid per range position for a scene shorter than a block
        const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 900);
        ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr << qtest::readFile(aBox.workingFile());

        const CJson aTruth = CJson::parseFile(aRaw.string() + "_truth.json");
        const double aPrf = aTruth["radar"]["prf"].number(), aCentroid = aTruth["doppler"]["centroid"].number();
        EXPECT_NE(qtest::readFile(aBox.work() / "Process.trace").find(", rounded: 0"), std::string::npos);
        qtest::InProcessEnvironment aEnv;
        YDF_SAR aSar;
        read_image_info(aRaw.c_str(), aSar);
        ASSERT_TRUE(aSar.mDopplerTableEstimated);
        for (const double aLine : {1024.0, 2048.0, 3072.0})
            EXPECT_LT(std::fabs(aSar.getDopplerFromPixel(512, aLine, false, false) - aCentroid), 0.005 * aPrf) << "line " << aLine;
        CDescriptionHeader aPar({"sar_processing"});
        ASSERT_TRUE(aPar.read((aBox.data() / "scene_par").c_str(), true));
        const double aVelocity = aTruth["velocity"]["true_processing_velocity"].number();
        const double aEstimated = aPar["sar_processing.Velocity"].getDouble();
        std::printf("%s: Doppler %.2f Hz (truth %.2f), velocity %.3f m/s (truth %.3f)\n", c.mPreset,
                    aSar.getDopplerFromPixel(512, 2048, false, false), aCentroid, aEstimated, aVelocity);
        if (!c.mLongAperture) {
            EXPECT_LT(std::fabs(aEstimated / aVelocity - 1.0), 0.002) << aEstimated << " against " << aVelocity;
        }

        // Clutter and noise mask the sidelobes, so the targets are measured on the same scene
        // without them, focused with the chain's estimates: the raw header takes the Doppler table
        // and the velocity (or keeps its velocity 1 % off for autofocus), and steps 0, 2 (3, 3, 3)
        // and 5 run.
        const fs::path aClean = aBox.data() / "clean_raw";
        std::vector<std::string> aCleanScene = {"--preset", c.mPreset, "--lines", c.mLongAperture ? "8192" : "4096",
                                                "--samples", c.mLongAperture ? "2048" : "1024", "--targets", "grid:2x2",
                                                "--velocity-error", c.mVelocityError, "--no-noise"};
        if (*c.mCentroid) aCleanScene.insert(aCleanScene.end(), {"--doppler-centroid", c.mCentroid});
        ASSERT_EQ(aBox.simulate(aClean.string(), aCleanScene).mStatus, 0);
        {
            auto aFrom = CDescriptionHeader::makeFull(), aTo = CDescriptionHeader::makeFull();
            ASSERT_TRUE(aFrom->read((aRaw.string() + "_hdr").c_str(), true));
            ASSERT_TRUE(aTo->read((aClean.string() + "_hdr").c_str(), true));
            const CDescriptionField& aTable = (*aFrom)["Processing.DopCenRangeCoeff"];
            CDescriptionField& aCopy = (*aTo)["Processing.DopCenRangeCoeff"];
            aCopy.resize(aTable.getNbrOfRows(), aTable.getNbrOfElements());
            for (int r = 0; r < aTable.getNbrOfRows(); ++r)
                for (int k = 0; k < aTable.getNbrOfElements(); ++k) aCopy.setValue(r, k, aTable.getDouble(r, k));
            (*aTo)["Processing.DopplerEstimatedFlag"].setValue("OK");
            if (!c.mLongAperture) (*aTo)["Processing.ProcessingVelocity"].setValue(0, aEstimated);
            ASSERT_TRUE(aTo->write((aClean.string() + "_hdr").c_str(), true, false));
        }
        auto aCleanArgs = qtest::DriverSandbox::defaultArguments(aClean, aBox.data() / "clean_slc");
        aCleanArgs[15] = "OK";
        aCleanArgs[17] = c.mLongAperture ? "NotOK" : "OK";
        const qtest::RunResult aCleanRun = aBox.run(aBox.writeArguments(aCleanArgs, "clean.txt"), {}, 600);
        ASSERT_EQ(aCleanRun.mStatus, 0) << aCleanRun.mStderr;
        if (c.mLongAperture) {
            CDescriptionHeader aCleanPar({"sar_processing"});
            ASSERT_TRUE(aCleanPar.read((aBox.data() / "clean_par").c_str(), true));
            const double aFocused = aCleanPar["sar_processing.Velocity"].getDouble();
            std::printf("%s: velocity %.3f m/s on the clean scene\n", c.mPreset, aFocused);
            EXPECT_LT(std::fabs(aFocused / aVelocity - 1.0), 0.002) << aFocused << " against " << aVelocity;
        }
        qtest::expectIdealTargets(aBox, aBox.data() / "clean_slc", aClean.string() + "_truth.json", 4, c.mAzimuthPslrDb);
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
                                                 "--scatterers", "500", "--write-doppler"};
        ASSERT_EQ(aBox.simulate(aRaw.string(), aScene).mStatus, 0);
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
    const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", "256", "--samples", "768", "--targets", "grid:1x1"};
    ASSERT_EQ(aBox.simulate(aRaw.string(), aScene).mStatus, 0);
    auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, aBox.data() / "scene_slc");
    aArgs[15] = aArgs[17] = "OK";  // steps 0, 2 and 5
    const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 300);
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    EXPECT_NE(qtest::readFile(aBox.work() / "Process.log").find("the raw header holds no Doppler centroid, 0 Hz is used"),
              std::string::npos);
}

}  // namespace
