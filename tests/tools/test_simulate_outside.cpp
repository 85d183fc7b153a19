// The outside check: a raw scene written by an independent simulator (shared/scenes/
// ers-points-small), read with the project's store and raster classes, against this simulator run
// with the same parameters (its truth file read as a scene): geometry, amplitude, carrier phase and
// Doppler sign.
#include <cmath>
#include <complex>
#include <filesystem>
#include <memory>
#include <vector>

#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_json.h"
#include "qorv_raster_file.h"
#include "qorv_sim_echo.h"
#include "qorv_sim_format.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_truth.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;
constexpr double kPi = CQORV_SIM_PI;

/// The scene's directory: the environment's QORVEX_OUTSIDE_SCENE_DIR, else the build's setting.
fs::path sceneDir()
{
    if (const char* d = std::getenv("QORVEX_OUTSIDE_SCENE_DIR")) return d;
    return QORVEX_OUTSIDE_SCENE_DIR;
}

class SimOutside : public ::testing::Test {
protected:
    void SetUp() override
    {
        mDir = sceneDir();
        if (!fs::exists(mDir / "ers_sim_raw.sml")) GTEST_SKIP() << "no outside scene at " << mDir;
        mTruth = CJson::parseFile((mDir / "ers_sim_truth.json").string());
        ASSERT_TRUE(fqorvSimApplyPreset(mScene, "ers2", false));
        fqorvSimApplySceneJson(mScene, mTruth);
        mScene.mNoise = false;
        fqorvSimCompleteScene(mScene);
        mOrbit = fqorvSimMakeOrbit(mScene);
        mTimeline = std::make_unique<CSimTimeline>(mScene);
    }

    qtest::InProcessEnvironment mEnv;
    fs::path mDir;
    CJson mTruth;
    CSimScene mScene;
    std::unique_ptr<CSimOrbit> mOrbit;
    std::unique_ptr<CSimTimeline> mTimeline;
};

TEST_F(SimOutside, GeometryAgreesWithTheIndependentSimulator)
{
    // The same Kepler elements give their state vectors to a millimetre.
    const CJson& sv = mTruth["orbit"]["state_vectors"];
    for (std::size_t i = 0; i < sv["times"].size(); ++i) {
        const CSimState s = mOrbit->state(sv["times"][i].number());
        const CSimVec3 p{sv["pos"][i][std::size_t{0}].number(), sv["pos"][i][1].number(), sv["pos"][i][2].number()};
        const CSimVec3 v{sv["vel"][i][std::size_t{0}].number(), sv["vel"][i][1].number(), sv["vel"][i][2].number()};
        EXPECT_LT((s.mPos - p).norm(), 1e-3) << i;
        EXPECT_LT((s.mVel - v).norm(), 1e-6) << i;
    }
    // Every target where they expect it, to a thousandth of a line and of a pixel.
    const CSimSceneTruth t = fqorvSimComputeTruth(mScene, *mOrbit, *mTimeline);
    ASSERT_EQ(t.mTargets.size(), mTruth["targets"].size());
    for (std::size_t i = 0; i < t.mTargets.size(); ++i) {
        const CJson& o = mTruth["targets"][i];
        EXPECT_EQ(t.mTargets[i].mTarget->mId, o["id"].string());
        EXPECT_NEAR(t.mTargets[i].mZeroDopplerTime, o["zero_doppler_time"].number(), 1e-6) << i;
        EXPECT_NEAR(t.mTargets[i].mSlantRange, o["slant_range"].number(), 1e-3) << i;
        EXPECT_NEAR(t.mTargets[i].mExpectedLine, o["expected_line"].number(), 1e-3) << i;
        EXPECT_NEAR(t.mTargets[i].mExpectedPixel, o["expected_pixel"].number(), 1e-3) << i;
        EXPECT_NEAR(t.mTargets[i].mVrZeroDoppler, o["vr_zero_doppler"].number(), 0.01) << i;
        EXPECT_NEAR(t.mTargets[i].mDopplerCentroid, o["doppler_centroid"].number(), 0.05) << i;
        // Their beam centre comes from their own antenna model: the same within a hundredth of a line.
        EXPECT_NEAR(t.mTargets[i].mBeamCentreTime, o["beam_centre_time"].number(), 1e-2 / 1679.9) << i;
        EXPECT_NEAR(t.mTargets[i].mExpectedPhaseDeg, o["expected_phase_deg"].number(), 1e-3) << i;
    }
    EXPECT_NEAR(t.mProcessingVelocity, mTruth["velocity"]["true_processing_velocity"].number(), 0.01);

    // Their orbit is the one that sees their scene centre at zero Doppler at t = 0 under 23 degrees.
    CSimKepler k = mScene.mKepler;
    const CJson& c = mTruth["scene_centre"]["ecef"];
    ASSERT_TRUE(fqorvSimPlaceOrbit(k, {c[std::size_t{0}].number(), c[1].number(), c[2].number()},
                                   mTruth["scene_centre"]["incidence_deg"].number() * CQORV_SIM_DEG, 1, false,
                                   mScene.mEllipsoid));
    EXPECT_NEAR(k.mRaan / CQORV_SIM_DEG, mTruth["orbit"]["kepler"]["raan_deg"].number(), 1e-7);
    EXPECT_NEAR(k.mM0 / CQORV_SIM_DEG, mTruth["orbit"]["kepler"]["m0_deg"].number(), 1e-7);
    EXPECT_NEAR(t.mFmRate, mTruth["doppler"]["fm_rate"].number(), 1.0);
}

TEST_F(SimOutside, EchoesAgreeInAmplitudeCarrierPhaseAndDopplerSign)
{
    // Their product through the store and the raster class.
    const std::string aRaw = (mDir / "ers_sim_raw").string();
    std::unique_ptr<CDescriptionHeader> h = CDescriptionHeader::makeFull();
    ASSERT_TRUE(h->read(aRaw.c_str(), true));
    EXPECT_NEAR((*h)["Processing.FastTime"].getDouble(0), mScene.mTauFirst, 1e-15);
    EXPECT_NEAR((*h)["ChannelInfo.PRF"].getDouble(0), mScene.mRadar.mPrf, 1e-9);
    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(*h, aRaw.c_str(), aParam);
    CRasterFile f;
    f.openRead(aParam);
    ASSERT_EQ(f.getNrOfLines(), mScene.mPulses);
    ASSERT_EQ(f.getNrOfPixels(), mScene.mSamples);

    const CSimEchoGenerator g(mScene, *mOrbit, *mTimeline);
    const int n = mScene.mSamples;
    std::vector<uint8_t> aPrefix(412), aBytes(2 * static_cast<std::size_t>(n));
    std::vector<CSimSample> aMine(static_cast<std::size_t>(n)), aTheirs(aMine.size());
    std::vector<CSimSample> aPrevMine(aMine.size()), aPrevTheirs(aMine.size());
    CSimSample aCross{0.0, 0.0}, aLagMine{0.0, 0.0}, aLagTheirs{0.0, 0.0};
    double aPowerMine = 0.0, aPowerTheirs = 0.0;
    for (long k = 0; k < mScene.mPulses; ++k) {
        f.readRowPrefix(static_cast<int>(k), aPrefix.data());
        ASSERT_EQ(fqorvSimGetBE32(&aPrefix[210]), static_cast<uint32_t>(mScene.mCounter0 + k));
        ASSERT_EQ(fqorvSimGetBE16(&aPrefix[214]), mScene.mSwstCode0);
        ASSERT_EQ(fqorvSimGetBE16(&aPrefix[60]), mScene.mRadar.mPriCode);
        f.readLines(static_cast<int>(k), 1, 0, n - 1, aBytes.data());
        g.echo(k, aMine.data());
        for (int i = 0; i < n; ++i) {
            aTheirs[i] = {aBytes[2 * i] - 15.5, aBytes[2 * i + 1] - 15.5};
            aCross += aTheirs[i] * std::conj(aMine[i]);
            aPowerMine += std::norm(aMine[i]);
            aPowerTheirs += std::norm(aTheirs[i]);
            if (k > 0) {
                aLagMine += aMine[i] * std::conj(aPrevMine[i]);
                aLagTheirs += aTheirs[i] * std::conj(aPrevTheirs[i]);
            }
        }
        std::swap(aMine, aPrevMine);
        std::swap(aTheirs, aPrevTheirs);
    }
    f.close();

    // Theirs = alpha * mine + their noise and quantisation: alpha is their gain in codes per unit,
    // real and positive (same carrier phase, target phases, pattern), and what is left is noise of
    // their stated level (noise_std * scale)^2 plus the 1/12 code^2 per component of quantisation.
    const CSimSample aAlpha = aCross / aPowerMine;
    const double aScale = mTruth["raster"]["scale"].number();
    EXPECT_NEAR(std::abs(aAlpha) / aScale, 1.0, 0.01);
    EXPECT_NEAR(std::arg(aAlpha) / CQORV_SIM_DEG, 0.0, 0.5);
    const double aCount = static_cast<double>(mScene.mPulses) * n;
    const double aResidual = (aPowerTheirs - std::norm(aCross) / aPowerMine) / aCount;
    const double aNoise = std::pow(mTruth["levels"]["noise_std"].number() * aScale, 2) + 2.0 / 12.0;
    EXPECT_NEAR(aResidual / aNoise, 1.0, 0.03);
    const double aCorrelation = std::abs(aCross) / std::sqrt(aPowerMine * aPowerTheirs);
    EXPECT_NEAR(aCorrelation, std::sqrt(1.0 - aNoise * aCount / aPowerTheirs), 0.01);
    EXPECT_GT(aCorrelation, 0.8);

    // The Doppler centroid by the average phase of adjacent-line correlation: +310 Hz from both.
    const double aDopMine = std::arg(aLagMine) * mScene.mRadar.mPrf / (2.0 * kPi);
    const double aDopTheirs = std::arg(aLagTheirs) * mScene.mRadar.mPrf / (2.0 * kPi);
    EXPECT_NEAR(aDopTheirs, 310.0, 5.0);
    EXPECT_NEAR(aDopMine, 310.0, 5.0);
    EXPECT_NEAR(aDopMine, aDopTheirs, 1.0);
}

}  // namespace
