// Omega-k focusing: the geometry set-up against closed forms, the block focuser on a synthetic
// range compressed point target against the ideal Kaiser-weighted responses, the fast reference
// phase against its direct evaluation, and thread-count independence.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "qorv_geometry_setup.h"
#include "qorv_irf_ideal.h"
#include "qorv_irf_measure.h"
#include "qorv_omegak_kernel.h"

namespace {

constexpr double c = 299792458.0;

CGeometryInput fErsInput()
{
    CGeometryInput in;
    in.mCarrierFrequency = 5.3e9;
    in.mSamplingRate = 18.96e6;
    in.mPrf = 1680.0;
    in.mNearRange = 840000.0;
    in.mCentreRange = 850000.0;
    in.mFarRange = 860000.0;
    in.mVelocity = 7100.0;
    in.mBandFraction = 0.8;
    in.mPresumming = 1;
    in.mDecimation = 2;
    return in;
}

TEST(GeometrySetup, ClosedForms)
{
    // No orbit: spacing from the processing velocity.
    CGeometryInput in = fErsInput();
    CSpaceborneGeometry g = fqorvSpaceborneGeometry(in, 0.0);
    EXPECT_DOUBLE_EQ(g.azimuthSpacing(), 2.0 * 7100.0 / 1680.0);
    EXPECT_DOUBLE_EQ(g.azimuthResolution(), g.azimuthSpacing() / 0.8);
    EXPECT_DOUBLE_EQ(g.mRangeSpacing, c / (2.0 * 18.96e6));
    // fdc = 0: phi of 90 degrees, the band holds zero Doppler, closest range = far range.
    EXPECT_NEAR(g.mPhi * 180.0 / M_PI, 90.0, 1e-12);
    EXPECT_NEAR(g.mApertureRangeMin, 860000.0, 1e-6);
    EXPECT_NEAR(g.apertureRange(0.0), 860000.0, 1e-6);
    EXPECT_DOUBLE_EQ(g.fmRate(850000.0), -2.0 * 5.3e9 * 7100.0 * 7100.0 / (850000.0 * c));

    // A band away from zero Doppler: the smallest range is the band's nearer end.
    g = fqorvSpaceborneGeometry(in, 2000.0);
    EXPECT_GT(g.mDopplerMin, 0.0);
    EXPECT_DOUBLE_EQ(g.mApertureRangeMin, std::min(g.apertureRange(g.mDopplerMin), g.apertureRange(g.mDopplerMax)));
    EXPECT_GT(g.mApertureRangeMin, g.mClosestRange);

    // Orbit: the scene centre on the equator at longitude 0 and height 0 lies at (a, 0, 0); only the
    // middle state vector (n/2 of 4) counts: its position and velocity give the ground spacing.
    in.mStateVectorNbr = 4;
    const double rs = 6378144.0 + 790000.0;
    in.mPos[0] = rs;
    in.mVel[1] = 7000.0;
    in.mVel[2] = 3000.0;
    g = fqorvSpaceborneGeometry(in, 0.0);
    const double re = 6378144.0;
    const double cosb = (rs * rs + re * re - 850000.0 * 850000.0) / (2.0 * re * rs);
    const double vs = std::sqrt(7000.0 * 7000.0 + 3000.0 * 3000.0);
    EXPECT_NEAR(g.azimuthSpacing(), 2.0 * vs / 1680.0 * (re / rs) * cosb, 1e-9);

    // The loop's Doppler position of the two variants, capped to the last line.
    double aPixel = 0.0, aLine = 0.0;
    CQORV_GEOMETRY_OMEGAK.dopplerPosition(5000, 4096, 100, 0, 1, 8192, 30000, aPixel, aLine);
    EXPECT_EQ(aPixel, 2048.0);
    EXPECT_EQ(aLine, 100.0 + 4096.0);
    CQORV_GEOMETRY_AUTOFOCUS.dopplerPosition(5000, 4096, 100, 33, 4, 8192, 3000, aPixel, aLine);
    EXPECT_EQ(aPixel, 2500.0);
    EXPECT_EQ(aLine, 3000.0);
}

/// An ERS-like focusing set-up and a point target in it.
struct CPointScene {
    COmegaKParam mParam;
    double mRangeBandwidth = 15.55e6;
    double mCentroid = 0.0;
    double mTargetLine = 0.0;   // zero-Doppler line
    double mTargetPixel = 0.0;  // closest-approach range sample
    double mTrueVelocity = 0.0; // the target's effective velocity; 0: the processing velocity
};

COmegaKParam fErsParam()
{
    COmegaKParam p;
    p.mAzimuthFftSize = 4096;
    p.mRangeFftSize = 128;
    p.mPrf = 1680.0;
    p.mSamplingRate = 18.96e6;
    p.mCarrierFrequency = 5.3e9;
    p.mVelocity = 7100.0;
    p.mNearRange = 850000.0;
    p.mBandFraction = 0.8;
    return p;
}

/// Fills the block with the range compressed echo of the scene's target: in range the Kaiser 2.12
/// weighted band delayed to R(t), in azimuth exp(-j 4 pi R(t) / lambda) with
/// R(t)^2 = R0^2 + v^2 (t - t0)^2, over the lines whose Doppler lies within 0.45 PRF of the centroid.
void fSynthesise(const CPointScene& s, CQorvMatrix<fcomplex>& theBlock)
{
    const COmegaKParam& p = s.mParam;
    const int nrfft = p.mRangeFftSize;
    const double dr = c / (2.0 * p.mSamplingRate);
    const double lambda = c / p.mCarrierFrequency;
    const double r0 = p.mNearRange + s.mTargetPixel * dr;
    const double aVelocity = s.mTrueVelocity > 0.0 ? s.mTrueVelocity : p.mVelocity;
    const std::vector<fcomplex> aBand = fqorvIrfKaiserBand(nrfft, p.mSamplingRate, s.mRangeBandwidth, 0.0, 2.12);
    FftPlan1D aInverse(nrfft, FftDirection::Inverse);
    for (int l = 0; l < p.mAzimuthFftSize; ++l) {
        const double t = (l - s.mTargetLine) / p.mPrf;
        const double x = aVelocity * t;
        const double r = std::sqrt(r0 * r0 + x * x);
        const double fd = -2.0 * aVelocity * x / (lambda * r);
        fcomplex* aRow = theBlock[l];
        std::fill(aRow, aRow + nrfft, fcomplex(0.0f, 0.0f));
        if (std::fabs(fd - s.mCentroid) > 0.45 * p.mPrf) continue;
        const double aDelay = (r - p.mNearRange) / dr;  // range samples
        const double aCarrier = -4.0 * M_PI * r / lambda;
        for (int k = 0; k < nrfft; ++k) {
            const int g = k <= nrfft / 2 ? k : k - nrfft;
            const double aPhase = aCarrier - 2.0 * M_PI * g * aDelay / nrfft;
            aRow[k] = aBand[k] * fcomplex(std::polar(1.0 / nrfft, aPhase));
        }
        aInverse.execute(aRow);
    }
}

/// Focuses the scene with the centroid's Doppler bin and no centring shift.
void fFocus(const CPointScene& s, COmegaKBlockFocuser& theFocuser)
{
    fSynthesise(s, theFocuser.block());
    const double ws = 2.0 * M_PI * s.mCentroid / s.mParam.mPrf + (s.mCentroid < 0.0 ? 2.0 * M_PI : 0.0);
    theFocuser.setDoppler(s.mCentroid, fqorvDopplerBin(std::fmod(ws, 2.0 * M_PI), s.mParam.mAzimuthFftSize), 0.0);
    theFocuser.focus();
}

/// Focuses the scene's target (in the precise mode all columns at theColumnVelocity) and measures it.
CIrfResponse fFocusAndMeasure(const CPointScene& s, COmegaKBlockFocuser& theFocuser, double theColumnVelocity)
{
    const COmegaKParam& p = s.mParam;
    if (p.mPrecise) theFocuser.setColumnVelocities(std::vector<double>(p.mRangeFftSize, theColumnVelocity));
    fFocus(s, theFocuser);
    CIrfOptions aOptions;
    int aLine0 = 0, aPixel0 = 0, aSize = 0;
    fqorvIrfRegion(s.mTargetLine, s.mTargetPixel, aOptions, aLine0, aPixel0, aSize);
    CIrfChip aRegion(aSize, aSize, aLine0, aPixel0);
    for (int l = 0; l < aSize; ++l)
        for (int n = 0; n < aSize; ++n) {
            const int r = aLine0 + l, col = aPixel0 + n;
            if (r >= 0 && r < p.mAzimuthFftSize && col >= 0 && col < p.mRangeFftSize)
                aRegion.at(l, n) = theFocuser.block()[r][col];
        }
    double aAzCentre = s.mCentroid / p.mPrf;
    aAzCentre -= std::floor(aAzCentre + 0.5);
    return fqorvIrfAnalyseTarget(aRegion, s.mTargetLine, s.mTargetPixel, aOptions, aAzCentre, 0.0);
}

TEST(BlockFocuser, PointTargetsMatchTheIdealResponse)
{
    const COmegaKParam p = fErsParam();
    const CIrfCut aIdealRange = fqorvIrfIdealRangeBand(15.55e6, p.mSamplingRate, 16);
    COmegaKBlockFocuser aFocuser(p);
    // Broadside, and squinted beyond half the PRF (the aperture lies some 1200 lines before the target).
    for (const double aCentroid : {0.0, 1500.0}) {
        SCOPED_TRACE(aCentroid);
        CPointScene s;
        s.mParam = p;
        s.mCentroid = aCentroid;
        s.mTargetLine = aCentroid == 0.0 ? 2048.0 : 3000.0;
        s.mTargetPixel = 40.0;
        const CIrfResponse aResponse = fFocusAndMeasure(s, aFocuser, 0.0);
        ASSERT_TRUE(aResponse.mFound) << aResponse.mNote;
        const CIrfCut aIdealAz = fqorvIrfIdealAzimuth(p.mPrf, p.mBandFraction, aCentroid, 0.0, p.mVelocity, 16);
        EXPECT_NEAR(aResponse.mPixel, s.mTargetPixel, 0.1);
        EXPECT_NEAR(aResponse.mLine, s.mTargetLine, 0.25);
        EXPECT_NEAR(aResponse.mRange.mIrw / aIdealRange.mIrw, 1.0, 0.05);
        EXPECT_NEAR(aResponse.mAzimuth.mIrw / aIdealAz.mIrw, 1.0, 0.05);
        EXPECT_NEAR(aResponse.mRange.mPslrDb, aIdealRange.mPslrDb, 1.5);
        EXPECT_NEAR(aResponse.mAzimuth.mPslrDb, aIdealAz.mPslrDb, 1.5);
        EXPECT_NEAR(aResponse.mRange.mIslrDb, aIdealRange.mIslrDb, 1.5);
        EXPECT_NEAR(aResponse.mAzimuth.mIslrDb, aIdealAz.mIslrDb, 1.5);
    }
}

TEST(BlockFocuser, FastReferencePhaseAndThreadsKeepTheProduct)
{
    COmegaKParam p = fErsParam();
    p.mAzimuthFftSize = 1024;
    p.mRangeFftSize = 300;  // two column chunks, the second partial
    p.mHalfPixelShift = true;
    COmegaKBlockFocuser aFast(p), aDirect(p), aTwo(p, 2);
    std::mt19937 aRandom(7);
    std::normal_distribution<float> aNormal;
    for (std::size_t i = 0; i < aFast.block().nRows() * aFast.block().nCols(); ++i) {
        const fcomplex v(aNormal(aRandom), aNormal(aRandom));
        aFast.block().data()[i] = aDirect.block().data()[i] = aTwo.block().data()[i] = v;
    }
    for (COmegaKBlockFocuser* f : {&aFast, &aDirect, &aTwo}) f->setDoppler(-2300.0, 655, 3.0);
    aFast.referencePhase();
    aDirect.referencePhaseDirect();
    double aMaxError = 0.0, aMaxValue = 0.0;
    for (std::size_t i = 0; i < aFast.block().nRows() * aFast.block().nCols(); ++i) {
        aMaxError = std::max(aMaxError, static_cast<double>(std::abs(aFast.block().data()[i] - aDirect.block().data()[i])));
        aMaxValue = std::max(aMaxValue, static_cast<double>(std::abs(aDirect.block().data()[i])));
    }
    EXPECT_LT(aMaxError, 4e-7 * aMaxValue);

    // The whole focusing with two threads gives the same bits as with one.
    for (std::size_t i = 0; i < aFast.block().nRows() * aFast.block().nCols(); ++i)
        aTwo.block().data()[i] = aFast.block().data()[i];
    aFast.focus();
    aTwo.focus();
    EXPECT_EQ(std::memcmp(aFast.block().data(), aTwo.block().data(),
                          aFast.block().nRows() * aFast.block().nCols() * sizeof(fcomplex)), 0);
}

TEST(PreciseFocuser, TargetsOfAnotherVelocityAndAtLBandFocusAtTheIdeal)
{
    // A target whose effective velocity lies 0.088 % off the processing velocity (an ERS swath edge)
    // moves 0.4 line and loses 2.8 dB of azimuth PSLR in the block mode; at L band the quartic
    // term of the hyperbola costs the block mode 0.9 dB and 0.15 line. The precise mode takes both.
    struct CCase { double f0, fs, prf, v, fd, bw, vtrue; int nazft; };
    const CCase aCases[] = {
        {5.3e9, 18.96e6, 1680.0, 7100.0, 290.0, 15.55e6, 7100.0 * (1.0 + 8.8e-4), 4096},
        {5.3e9, 18.96e6, 1680.0, 7100.0, 290.0, 15.55e6, 7100.0 * (1.0 - 8.8e-4), 4096},
        {1.27e9, 32e6, 2160.0, 7180.0, 120.0, 28e6, 7180.0, 8192},
    };
    for (const CCase& c : aCases) {
        COmegaKParam p = fErsParam();
        p.mCarrierFrequency = c.f0;
        p.mSamplingRate = c.fs;
        p.mPrf = c.prf;
        p.mVelocity = c.v;
        p.mAzimuthFftSize = c.nazft;
        p.mPrecise = true;
        CPointScene s;
        s.mParam = p;
        s.mCentroid = c.fd;
        s.mRangeBandwidth = c.bw;
        s.mTargetLine = c.nazft / 2;
        s.mTargetPixel = 40.0;
        s.mTrueVelocity = c.vtrue;
        SCOPED_TRACE(testing::Message() << c.f0 << " Hz carrier, target at " << c.vtrue << " m/s");
        COmegaKBlockFocuser aFocuser(p);
        const CIrfResponse a = fFocusAndMeasure(s, aFocuser, c.vtrue);
        ASSERT_TRUE(a.mFound) << a.mNote;
        const CIrfCut aIdeal = fqorvIrfIdealAzimuth(p.mPrf, p.mBandFraction, c.fd, 0.0, c.vtrue, 16);
        EXPECT_NEAR(a.mLine, s.mTargetLine, 0.01);
        EXPECT_NEAR(a.mPixel, s.mTargetPixel, 0.01);
        EXPECT_NEAR(a.mAzimuth.mIrw / aIdeal.mIrw, 1.0, 0.01);
        EXPECT_NEAR(a.mAzimuth.mPslrDb, aIdeal.mPslrDb, 0.3);
        EXPECT_NEAR(a.mAzimuth.mIslrDb, aIdeal.mIslrDb, 0.3);
    }

    // The precise stages give the same bits with one and two threads.
    COmegaKParam p = fErsParam();
    p.mAzimuthFftSize = 1024;
    p.mPrecise = true;
    COmegaKBlockFocuser aOne(p), aTwo(p, 2);
    CPointScene s;
    s.mParam = p;
    s.mCentroid = 290.0;
    s.mTargetLine = 512.0;
    s.mTargetPixel = 40.0;
    fFocusAndMeasure(s, aOne, 7103.0);
    fFocusAndMeasure(s, aTwo, 7103.0);
    EXPECT_EQ(std::memcmp(aOne.block().data(), aTwo.block().data(), 1024u * p.mRangeFftSize * sizeof(fcomplex)), 0);
}

}  // namespace
