// Point-target measurement against synthetic impulse responses of known width and sidelobes.
#include <cmath>
#include <limits>

#include <gtest/gtest.h>

#include "qorv_irf_ideal.h"
#include "qorv_irf_measure.h"
#include "qorv_irf_truth.h"
#include "test_irf_synthetic.h"

namespace {

using namespace irftest;

void expectFigures(const CIrfCut& theCut, const Figures& theExpected, double theIrwRel, double theDb,
                   const char* theWhat)
{
    SCOPED_TRACE(theWhat);
    ASSERT_TRUE(theCut.mValid);
    EXPECT_NEAR(theCut.mIrw, theExpected.mIrw, theIrwRel * theExpected.mIrw);
    EXPECT_NEAR(theCut.mPslrDb, theExpected.mPslr, theDb);
    EXPECT_NEAR(theCut.mIslrDb, theExpected.mIslr, theDb);
}

Figures figuresOf(const CIrfCut& c) { return {c.mIrw, c.mPslrDb, c.mIslrDb}; }

CIrfResponse analyse(const CIrfChip& theImage, double theLine, double thePixel, const CIrfOptions& theOptions = {},
                     double theAzimuthCentre = kNaN)
{
    return fqorvIrfAnalyseTarget(theImage, theLine, thePixel, theOptions, theAzimuthCentre, kNaN);
}

}  // namespace

// An unweighted band of half the sampling rate: |s(x)| = |sinc(x / 2)|, x in samples. Closed forms
// for the definitions used: width 2 x 0.885893 samples at half power (sinc^2(0.4429465) = 1/2),
// PSLR -13.26 dB, and ISLR the energy between the first nulls (|x| = 2) and 10 widths over the
// energy between the nulls: -10.216 dB by quadrature (-9.68 dB with unbounded sidelobes).
TEST(IrfMeasure, UnweightedBandMatchesSincClosedForms)
{
    const Figures aSinc{4.0 * 0.4429465, -13.2619, -10.216};

    const CIrfChip aImage = pointTarget(128, 128, 64.0, 64.3, band(0.5), 0.0, band(0.5), 0.25);
    CIrfOptions aOptions;
    aOptions.mWindow = 64;
    const CIrfResponse r = analyse(aImage, 64.0, 64.0, aOptions);
    ASSERT_TRUE(r.mFound) << r.mNote;
    expectFigures(r.mRange, aSinc, 1e-3, 0.02, "range");
    expectFigures(r.mAzimuth, aSinc, 1e-3, 0.02, "azimuth");
    EXPECT_NEAR(r.mRange.mMinimumLeft, -2.0, 0.07);
    EXPECT_NEAR(r.mRange.mMinimumRight, 2.0, 0.07);

    // The ideal routine, fed the same band, gives the same closed forms.
    const std::vector<fcomplex> aFlat = fqorvIrfKaiserBand(CQORV_IRF_IDEAL_BINS, 1.0, 0.5, 0.0, 0.0);
    expectFigures(fqorvIrfMeasureSpectrum(aFlat, 0.0, 16), aSinc, 1e-3, 0.02, "ideal");
}

// Kaiser weighted bands as the chain makes them: in range over 0.82 of the sampling rate, in
// azimuth over 0.8 of the PRF around the Doppler centroid, times the antenna pattern.
TEST(IrfMeasure, KaiserBandsMatchIdealRoutineAndSimulatorTheory)
{
    const CIrfChip aImage = pointTarget(128, 128, 60.3, 70.6, ersAzimuth(), kCentroid / kPrf, ersRange(), 0.0);
    const CIrfResponse r = analyse(aImage, 60.3, 70.6);
    ASSERT_TRUE(r.mFound) << r.mNote;
    const CIrfCut aIdealRange = fqorvIrfIdealRangeBand(kBandwidth, kFs, 16);
    const CIrfCut aIdealAz = fqorvIrfIdealAzimuth(kPrf, 0.8, kCentroid, kAntenna, kPlatformSpeed, 16);
    expectFigures(r.mRange, figuresOf(aIdealRange), 1e-3, 0.05, "range against ideal");
    expectFigures(r.mAzimuth, figuresOf(aIdealAz), 1e-3, 0.05, "azimuth against ideal");
    EXPECT_FALSE(r.mRange.mClipped || r.mAzimuth.mClipped);

    // The ideal routines against the independent program's figures.
    expectFigures(aIdealRange, kTheoryRangeKaiser, 1e-3, 0.02, "range band");
    expectFigures(fqorvIrfIdealRangeChirp(kBandwidth, kPulse, kFs, 16), kTheoryRangeChain, 1e-3, 0.03, "range chirp");
    expectFigures(fqorvIrfIdealAzimuth(kPrf, 0.8, kCentroid, 0.0, 0.0, 16), kTheoryAzimuthKaiser, 1e-3, 0.02,
                  "azimuth without pattern");
    expectFigures(aIdealAz, kTheoryAzimuthCentre, 1e-3, 0.03, "azimuth with pattern");
    // The effective velocity narrows the pattern in Doppler: a wider, lower-sidelobe response.
    const CIrfCut aEffective = fqorvIrfIdealAzimuth(kPrf, 0.8, kCentroid, kAntenna, kEffectiveVelocity, 16);
    EXPECT_GT(aEffective.mIrw, aIdealAz.mIrw * 1.01);
    EXPECT_LT(aEffective.mPslrDb, aIdealAz.mPslrDb - 0.5);
}

// Sub-sample peak positions and the peak's phase, for targets anywhere between samples.
TEST(IrfMeasure, FractionalPositionsAndPhase)
{
    const double aPositions[][3] = {{40.0, 41.0, 0.0},   {40.37, 41.71, 1.0},  {40.5, 41.5, -2.0},
                                    {41.93, 40.06, 2.9}, {39.21, 42.44, -0.7}, {40.75, 40.25, 3.1}};
    for (const auto& p : aPositions) {
        SCOPED_TRACE(testing::Message() << "line " << p[0] << " pixel " << p[1]);
        const fcomplex aAmp = std::polar(3.0f, static_cast<float>(p[2]));
        const CIrfChip aImage = pointTarget(96, 96, p[0], p[1], ersAzimuth(), kCentroid / kPrf, ersRange(), 0.0, aAmp);
        const CIrfResponse r = analyse(aImage, std::round(p[0]) + 2, std::round(p[1]) - 3);
        ASSERT_TRUE(r.mFound);
        EXPECT_NEAR(r.mLine, p[0], 0.005);
        EXPECT_NEAR(r.mPixel, p[1], 0.005);
        EXPECT_NEAR(std::remainder(r.mPhaseDeg - p[2] * 180.0 / kPi, 360.0), 0.0, 0.5);
    }
}

// The azimuth spectrum of a squinted SLC is centred on the Doppler centroid and may wrap: the
// zeros of the upsampling go where the spectrum is lowest, and the figures stay those of the
// unsquinted response.
TEST(IrfMeasure, SquintedAzimuthSpectrumMeasuresLikeUnsquinted)
{
    const CIrfResponse aRef = analyse(pointTarget(96, 96, 48.3, 47.6, ersAzimuth(), 0.0, ersRange(), 0.0), 48, 48);
    ASSERT_TRUE(aRef.mFound);
    for (double ca : {0.4, 0.5, 0.7, -0.45}) {
        SCOPED_TRACE(testing::Message() << "centre " << ca << " PRF");
        const CIrfChip aImage = pointTarget(96, 96, 48.3, 47.6, ersAzimuth(), ca, ersRange(), 0.0);
        const CIrfResponse r = analyse(aImage, 48, 48);
        ASSERT_TRUE(r.mFound);
        EXPECT_NEAR(std::remainder(r.mAzimuthCentre - ca, 1.0), 0.0, 0.02);
        expectFigures(r.mAzimuth, figuresOf(aRef.mAzimuth), 2e-3, 0.05, "azimuth");
        expectFigures(r.mRange, figuresOf(aRef.mRange), 2e-3, 0.05, "range");
        EXPECT_NEAR(r.mLine, 48.3, 0.005);
        EXPECT_NEAR(r.mPixel, 47.6, 0.005);

        // Zeros put in the middle of the band (padding as if the spectrum were at 0) break the
        // response: the check above is not passed by accident.
        const CIrfResponse aWrong = analyse(aImage, 48, 48, {}, ca + 0.5);
        EXPECT_TRUE(!aWrong.mFound || std::fabs(aWrong.mAzimuth.mIrw - aRef.mAzimuth.mIrw) > 0.05 ||
                    std::fabs(aWrong.mAzimuth.mPslrDb - aRef.mAzimuth.mPslrDb) > 1.0);
    }
}

// What a cut or a chip cannot give: no crossing, no signal, a window too small for 10 widths.
TEST(IrfMeasure, DegenerateCutsAndWindows)
{
    std::vector<double> aRamp(64);
    for (int i = 0; i < 64; ++i) aRamp[i] = 1.0 + i;
    EXPECT_FALSE(fqorvIrfMeasureCut(aRamp, 16).mValid);
    EXPECT_FALSE(fqorvIrfMeasureCut(std::vector<double>(64, 0.0), 16).mValid);

    const CIrfResponse aNone = analyse(CIrfChip(64, 64, 0, 0), 32, 32);
    EXPECT_FALSE(aNone.mFound);
    EXPECT_FALSE(aNone.mNote.empty());

    // 10 azimuth widths are about 14 lines: a 16-line window cuts them short, and says so.
    const CIrfChip aImage = pointTarget(64, 64, 32.2, 31.9, ersAzimuth(), 0.2, band(0.82, 2.12), 0.0);
    CIrfOptions aSmall;
    aSmall.mWindow = 16;
    const CIrfResponse r = analyse(aImage, 32, 32, aSmall);
    ASSERT_TRUE(r.mFound);
    EXPECT_TRUE(r.mAzimuth.mClipped);
    EXPECT_NEAR(r.mAzimuth.mSidelobeExtent, 8.0, 0.1);
    EXPECT_NEAR(r.mLine, 32.2, 0.01);

    // The peak search keeps to its box: a brighter target outside it is not taken.
    CIrfChip aTwo = pointTarget(96, 96, 30.0, 30.0, band(0.8, 2.12), 0.0, band(0.82, 2.12), 0.0);
    addPointTarget(aTwo, 70.0, 70.0, band(0.8, 2.12), 0.0, band(0.82, 2.12), 0.0, 5.0f);
    const CIrfResponse aNear = analyse(aTwo, 33.0, 28.0);
    EXPECT_NEAR(aNear.mLine, 30.0, 0.01);
    EXPECT_NEAR(aNear.mPixel, 30.0, 0.01);
}

// The truth file: what is required, what is optional, and the ideal it leads to.
TEST(IrfTruth, ReadsTargetsAndChoosesThePatternVelocity)
{
    const std::string aText = R"({
      "radar": {"wavelength": 0.0565646, "bandwidth": 15.55e6, "pulse_length": 37.12e-6,
                "sampling_rate": 18.96e6, "prf": 1679.9023936391638, "antenna_length": 10.0},
      "doppler": {"centroid": 310.0},
      "velocity": {"true_processing_velocity": 7109.517279697725},
      "orbit": {"state_vectors": {"vel": [[1, 2, 3], [5137.93, -440.0, 5536.7], [0, 0, 0]]}},
      "targets": [{"id": "A", "expected_line": 10.5, "expected_pixel": 20.25, "isolated": true,
                   "expected_phase_fd_deg": 12.0},
                  {"id": "B", "expected_line": 30, "expected_pixel": 40, "isolated": false}]
    })";
    CJson aJson = CJson::parse(aText);
    const CIrfTruth t = fqorvIrfTruthFromJson(aJson);
    ASSERT_EQ(t.mTargets.size(), 2u);
    EXPECT_DOUBLE_EQ(t.mTargets[0].mPixel, 20.25);
    EXPECT_TRUE(t.mTargets[0].mHasPhase);
    EXPECT_FALSE(t.mTargets[1].mIsolated || t.mTargets[1].mHasPhase);
    EXPECT_NEAR(t.mPlatformVelocity, std::sqrt(5137.93 * 5137.93 + 440.0 * 440.0 + 5536.7 * 5536.7), 1e-6);

    const CIrfIdeal aIdeal = fqorvIrfIdealForTruth(t, 0.8, 16);
    EXPECT_EQ(aIdeal.mVelocitySource, "platform");
    EXPECT_EQ(aIdeal.mRangeModel, "chirp");
    expectFigures(aIdeal.mRange, kTheoryRangeChain, 1e-3, 0.03, "range");
    EXPECT_EQ(fqorvIrfIdealForTruth(t, 0.8, 16, 7000.0).mVelocitySource, "option");

    aJson["orbit"] = CJson();
    aJson["radar"]["pulse_length"] = CJson();
    const CIrfIdeal aFallback = fqorvIrfIdealForTruth(fqorvIrfTruthFromJson(aJson), 0.8, 16);
    EXPECT_EQ(aFallback.mVelocitySource, "effective");
    EXPECT_NEAR(aFallback.mPatternVelocity, kEffectiveVelocity, 1e-9);
    EXPECT_EQ(aFallback.mRangeModel, "band");

    aJson["radar"]["prf"] = CJson("fast");
    try {
        fqorvIrfTruthFromJson(aJson);
        ADD_FAILURE() << "a PRF that is not a number was taken";
    } catch (const std::runtime_error& e) {
        EXPECT_NE(std::string(e.what()).find("radar.prf"), std::string::npos) << e.what();
    }
}
