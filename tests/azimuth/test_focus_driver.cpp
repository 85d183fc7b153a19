// Step 5 through the driver (a real process): a simulated ERS scene whose range compressed product is
// synthesised here from the scene's truth, focused by steps 0 and 5 and measured with qorvex_irf.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "qorv_az_SLC.h"
#include "qorv_description_section.h"
#include "qorv_fft.h"
#include "qorv_irf_ideal.h"
#include "qorv_json.h"
#include "qorv_raster_file.h"
#include "qorvex_irf_check.h"
#include "qorvex_test_support.h"
#include "tools_raster_file_exp.h"

namespace {

constexpr double c = 299792458.0;

/// Writes "<root>_rc" and its header: the raw header with the range compressed raster's fields,
/// and per target the Kaiser 2.12 band in range at R(t) with R(t)^2 = R0^2 + v^2 (t - t0)^2, the
/// carrier exp(-j 4 pi R / lambda) and the two-way antenna pattern, within half the PRF of the centroid.
void fWriteRangeCompressed(const std::filesystem::path& theRaw, const std::filesystem::path& theRc, const CJson& theTruth)
{
    auto aHeader = CDescriptionHeader::makeFull();
    ASSERT_TRUE(aHeader->read((theRaw.string() + "_hdr").c_str(), true));
    const CJson& radar = theTruth["radar"];
    const double fs = radar["sampling_rate"].number(), prf = radar["prf"].number(), lambda = radar["wavelength"].number();
    const double aRNear = theTruth["window"]["r_near"].number();
    const double v = theTruth["velocity"]["true_processing_velocity"].number();
    const double fdc = theTruth["doppler"]["centroid"].number();
    const CJson& aVel = theTruth["orbit"]["state_vectors"]["vel"][4];
    const double aPlatform = std::hypot(aVel[std::size_t{0}].number(), aVel[1].number(), aVel[2].number());
    const double aAntenna = radar["antenna_length"].number();
    const int aLines = (*aHeader)["RasterInfo.NrOfLinesPerImage"].getInteger();
    const int aWidth = static_cast<int>(radar["compressed_width"].number());
    const double dr = c / (2.0 * fs);

    CDescriptionHeader& h = *aHeader;
    h["RasterInfo.CellType"].setValue("FLOAT_COMPLEX");
    h["RasterInfo.RowPrefix"].setValue(0);
    h["RasterInfo.NrOfPixelsPerLine"].setValue(aWidth);
    h["Processing.SlantRange"].resize(1, 3);
    for (int k = 0; k < 3; ++k) h["Processing.SlantRange"].setValue(k, aRNear + k * (aWidth - 1) / 2.0 * dr);
    ASSERT_TRUE(h.write((theRc.string() + "_hdr").c_str(), true, false));
    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(h, theRc.c_str(), aParam);
    CRasterFile aOut;
    aOut.openWrite(CQORV_RF_OPEN_WRITE, aParam);

    const int n = 1024;  // range transform of one target's pulse
    const std::vector<fcomplex> aBand = fqorvIrfKaiserBand(n, fs, radar["bandwidth"].number(), 0.0, 2.12);
    FftPlan1D aInverse(n, FftDirection::Inverse);
    std::vector<fcomplex> aLine(aWidth), aPulse(n);
    for (int l = 0; l < aLines; ++l) {
        std::fill(aLine.begin(), aLine.end(), fcomplex(0.0f, 0.0f));
        for (std::size_t k = 0; k < theTruth["targets"].size(); ++k) {
            const CJson& t = theTruth["targets"][k];
            const double r0 = t["slant_range"].number();
            const double x = v * (l - t["expected_line"].number()) / prf;
            const double r = std::sqrt(r0 * r0 + x * x);
            const double fd = -2.0 * v * x / (lambda * r);
            if (std::fabs(fd - fdc) > 0.5 * prf) continue;
            const double u = aAntenna * (fd - fdc) / (2.0 * aPlatform);
            const double aSinc = u == 0.0 ? 1.0 : std::sin(M_PI * u) / (M_PI * u);
            const double aDelay = (r - aRNear) / dr;
            const int aCentre = static_cast<int>(std::lround(aDelay));
            for (int b = 0; b < n; ++b) {
                const int g = b <= n / 2 ? b : b - n;
                const double aPhase = -4.0 * M_PI * r / lambda - 2.0 * M_PI * g * (aDelay - aCentre + n / 2) / n;
                aPulse[b] = aBand[b] * fcomplex(std::polar(aSinc * aSinc / n, aPhase));
            }
            aInverse.execute(aPulse.data());
            for (int s = 0; s < n; ++s) {
                const int p = aCentre - n / 2 + s;
                if (p >= 0 && p < aWidth) aLine[p] += aPulse[s];
            }
        }
        fqorvWriteLine(aOut, aLine.data(), l);
    }
    aOut.close();
}

/// Simulates an ERS scene "ers_raw" (noise-free, true centroid in the header), writes its range
/// compressed product "ers_rc" and runs steps 0 and 5 through the driver into "ers_slc" (one block
/// of 8192 lines; the other steps off). Returns the driver's arguments.
std::vector<std::string> fSimulateAndFocus(qtest::DriverSandbox& theBox, std::vector<std::string> theScene)
{
    const auto aRaw = theBox.data() / "ers_raw";
    theScene.insert(theScene.end(), {"--write-doppler", "--no-noise"});
    const qtest::RunResult aSim = theBox.simulate(aRaw, theScene);
    EXPECT_EQ(aSim.mStatus, 0) << aSim.mStderr;
    {
        qtest::InProcessEnvironment aEnv;
        fWriteRangeCompressed(aRaw, theBox.data() / "ers_rc", CJson::parseFile(aRaw.string() + "_truth.json"));
    }
    auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, theBox.data() / "ers_slc");
    aArgs[15] = aArgs[16] = aArgs[17] = "OK";
    const qtest::RunResult aRun = theBox.run(theBox.writeArguments(aArgs), {}, 3000);
    EXPECT_EQ(aRun.mStatus, 0) << aRun.mStderr << qtest::readFile(theBox.workingFile());
    return aArgs;
}

TEST(FocusDriver, SimulatedErsTargetsFocusToTheirIdealResponses)
{
    qtest::DriverSandbox aBox;
    const auto aRaw = aBox.data() / "ers_raw";
    const auto aTruthFile = aBox.data() / "ers_raw_truth.json";
    auto aArgs = fSimulateAndFocus(aBox, {"--lines", "6144", "--samples", "1024", "--targets", "grid:3x2"});
    EXPECT_FALSE(std::filesystem::exists(aBox.data() / "ers_slc_tmp"));
    {  // the normalisation ran on the product and its factor reached the final header
        qtest::InProcessEnvironment aEnv;
        auto aSlc = CDescriptionHeader::makeFull();
        ASSERT_TRUE(aSlc->read((aBox.data() / "ers_slc_hdr").c_str(), true));
        std::string aFactor;
        EXPECT_TRUE(fqorvGetUserKey(*aSlc, "NORMALIZATION FACTOR", aFactor));
        EXPECT_GT(std::atof(aFactor.c_str()), 0.0);
    }
    qtest::expectIdealTargets(aBox, aBox.data() / "ers_slc", aTruthFile, 6);

    // The same step with blocks of 4096 lines: a first block, then a last one moved back over it.
    {
        qtest::InProcessEnvironment aEnv;
        std::vector<std::string> aStepArgs = {"SAR azimuth omega/k processor", (aBox.data() / "ers_rc").string(),
                                              (aBox.data() / "ers_blocks_slc").string(),
                                              (aBox.data() / "ers_par").string(), "1", "1", "4096", "0", "0"};
        std::vector<char*> aArgv;
        for (std::string& a : aStepArgs) aArgv.push_back(a.data());
        ASSERT_EQ(qorv_az_SLC(static_cast<int>(aArgv.size()), aArgv.data()), 0);
        const std::string aTrace = aEnv.trace();
        EXPECT_NE(aTrace.find("Wrote Block 0"), std::string::npos);
        EXPECT_NE(aTrace.find("  back = "), std::string::npos);
    }
    qtest::expectIdealTargets(aBox, aBox.data() / "ers_blocks_slc", aTruthFile, 6);

    // The precise mode on the same product: every target within hundredths of a line, the mode in
    // the header; an unknown mode is refused, and with too few state vectors for the orbit the block
    // mode focuses with a warning.
    {
        qtest::InProcessEnvironment aEnv;
        auto aStep = [&](const char* theMode, const std::string& theSlc) {
            setenv("QORVEX_AZIMUTH", theMode, 1);
            std::vector<std::string> aStepArgs = {"SAR azimuth omega/k processor", (aBox.data() / "ers_rc").string(),
                                                  (aBox.data() / theSlc).string(), (aBox.data() / "ers_par").string(),
                                                  "1", "1", "4096", "0", "0"};
            std::vector<char*> aArgv;
            for (std::string& a : aStepArgs) aArgv.push_back(a.data());
            const int aResult = qorv_az_SLC(static_cast<int>(aArgv.size()), aArgv.data());
            unsetenv("QORVEX_AZIMUTH");
            return aResult;
        };
        ASSERT_EQ(aStep("precise", "ers_precise_slc"), 0);
        auto aSlc = CDescriptionHeader::makeFull();
        ASSERT_TRUE(aSlc->read((aBox.data() / "ers_precise_slc_hdr").c_str(), true));
        std::string aMode;
        EXPECT_TRUE(fqorvGetUserKey(*aSlc, "AZIMUTH FOCUSING", aMode));
        EXPECT_EQ(aMode, "precise");

        auto aHeader = CDescriptionHeader::makeFull();
        const std::string aRcHeader = (aBox.data() / "ers_rc_hdr").string();
        ASSERT_TRUE(aHeader->read(aRcHeader.c_str(), true));
        const int aVectors = (*aHeader)["StateVectorData.nStateVectors"].getInteger();
        (*aHeader)["StateVectorData.nStateVectors"].setValue(3);
        ASSERT_TRUE(aHeader->write(aRcHeader.c_str(), true, false));
        ASSERT_EQ(aStep("precise", "ers_fallback_slc"), 0);
        EXPECT_NE(aEnv.trace().find("precise azimuth mode not possible"), std::string::npos);
        (*aHeader)["StateVectorData.nStateVectors"].setValue(aVectors);
        ASSERT_TRUE(aHeader->write(aRcHeader.c_str(), true, false));
        EXPECT_QORV_FAILURE(aStep("fast", "ers_fast_slc"), 783361);
        unsetenv("QORVEX_AZIMUTH");
    }
    qtest::expectIdealTargets(aBox, aBox.data() / "ers_precise_slc", aTruthFile, 6, 1.5, 0.05, 0.02);

    // State vectors announced without velocities: failure 848642 naming the field, and no product.
    {
        qtest::InProcessEnvironment aEnv;
        auto aHeader = CDescriptionHeader::makeFull();
        const std::string aRcHeader = (aBox.data() / "ers_rc_hdr").string();
        ASSERT_TRUE(aHeader->read(aRcHeader.c_str(), true));
        (*aHeader)["StateVectorData.vel_x"].reset();
        ASSERT_TRUE(aHeader->write(aRcHeader.c_str(), true, false));
    }
    aArgs[2] = (aBox.data() / "broken_slc").string();
    std::filesystem::copy_file(aBox.data() / "ers_rc", aBox.data() / "broken_rc");
    std::filesystem::copy_file(aBox.data() / "ers_rc.sml", aBox.data() / "broken_rc.sml");
    const qtest::RunResult aBroken = aBox.run(aBox.writeArguments(aArgs));
    EXPECT_EQ(aBroken.mExitId, 848642) << aBroken.mStderr;
    EXPECT_NE(aBox.trace().find("Missing mandatory field vel in file"), std::string::npos);
    EXPECT_FALSE(std::filesystem::exists(aBox.data() / "broken_slc"));
}

// A full ERS frame (28000 x 5616 raw samples, a few hundred targets) through steps 0 and 5; run by
// hand for the figures: test_focus --gtest_also_run_disabled_tests --gtest_filter=*FullFrame*
TEST(FocusDriver, DISABLED_FullFrame)
{
    qtest::DriverSandbox aBox;
    fSimulateAndFocus(aBox, {"--full-frame"});
    const std::string aTrace = aBox.trace();
    const std::size_t aAt = aTrace.find("DURATION [ SAR azimuth omega/k processor]");
    ASSERT_NE(aAt, std::string::npos);
    std::printf("%s\n", aTrace.substr(aAt, aTrace.find('\n', aAt) - aAt).c_str());
    qtest::expectIdealTargets(aBox, aBox.data() / "ers_slc", aBox.data() / "ers_raw_truth.json", 0);
}

}  // namespace
