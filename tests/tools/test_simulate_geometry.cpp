// The simulator's geometry against closed forms: range histories, Doppler, beam-centre times,
// effective velocity, orbit placement and the ground point of a zero-Doppler time and range;
// dates and the pulse timeline.
#include <cmath>

#include <gtest/gtest.h>

#include "qorv_sim_geometry.h"
#include "qorv_sim_orbit.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"

namespace {

constexpr double kLambda = 299792458.0 / 5.3e9;

/// A satellite in uniform straight motion: S(t) = S0 + V t.
class CLineOrbit : public CSimOrbit {
public:
    CLineOrbit(CSimVec3 theStart, CSimVec3 theVelocity) : mStart(theStart), mVel(theVelocity) {}
    CSimState state(double t) const override { return {mStart + mVel * t, mVel}; }

private:
    CSimVec3 mStart, mVel;
};

TEST(SimGeometry, StraightLineRangeHistoryDopplerAndBeamCentre)
{
    const double v = 7100.0, x0 = 3550.0, D = 300000.0, H = 780000.0;
    const CLineOrbit aOrbit({0.0, 0.0, H}, {v, 0.0, 0.0});
    const CSimVec3 P{x0, D, 0.0};
    const double r0 = std::hypot(D, H), t0 = x0 / v;
    for (double fdc : {0.0, 310.0, -450.0, 4000.0}) {  // 4000 Hz lies beyond +-PRF/2 of any preset
        const CSimGeometry g(aOrbit, kLambda, fdc);
        // R(t) is the hyperbola sqrt(R0^2 + v^2 (t - t0)^2).
        for (double t : {-1.0, 0.2, 0.5, 2.3})
            EXPECT_NEAR(g.range(t, P), std::sqrt(r0 * r0 + v * v * (t - t0) * (t - t0)), 1e-6);
        EXPECT_NEAR(g.zeroDopplerTime(P, 0.0), t0, 1e-9);
        // The Doppler is positive while the target approaches (before t0) and has the closed form.
        const double t = t0 - 0.3;
        EXPECT_GT(g.doppler(t, P), 0.0);
        EXPECT_NEAR(g.doppler(t, P), 2.0 * v * v * 0.3 / (kLambda * g.range(t, P)), 1e-9);
        EXPECT_LT(g.doppler(t0 + 0.3, P), 0.0);
        // Beam centre: Doppler fdc, i.e. v (t0 - t) = R0 s / sqrt(1 - s^2) with s = lambda fdc / 2 v.
        const double s = kLambda * fdc / (2.0 * v);
        const double tBc = t0 - r0 * s / std::sqrt(1.0 - s * s) / v;
        EXPECT_NEAR(g.beamCentreTime(P, t0), tBc, 1e-9) << fdc;
        EXPECT_NEAR(g.doppler(tBc, P), fdc, 1e-6);
        EXPECT_NEAR(g.azimuthOffBeam(tBc, P), 0.0, 1e-12);
        // Ahead of the beam before the beam centre; the pattern's edge where psi is asked.
        EXPECT_GT(g.azimuthOffBeam(tBc - 0.1, P), 0.0);
        const double tEdge = g.timeOfAzimuthAngle(P, -0.0113, tBc);
        EXPECT_NEAR(g.azimuthOffBeam(tEdge, P), -0.0113, 1e-12);
        // A straight line is its own hyperbola: both effective velocities are v.
        EXPECT_NEAR(g.effectiveVelocityAtZeroDoppler(P, t0), v, 1e-3);
        EXPECT_NEAR(g.effectiveVelocityFit(P, t0, tBc - 0.4, tBc + 0.4), v, 1e-6);
    }
}

TEST(SimGeometry, CircularOrbitEffectiveVelocityIsSqrtOfSatelliteTimesGroundVelocity)
{
    // Equatorial circular orbit, Earth not rotating: inertial = Earth-fixed, S = a (cos nt, sin nt, 0).
    CSimKepler k;
    k.mA = 7150000.0;
    k.mE = k.mInc = k.mArgp = k.mOmegaEarth = 0.0;
    const CSimKeplerOrbit aOrbit(k);
    const double n = std::sqrt(k.mMu / (k.mA * k.mA * k.mA));
    EXPECT_NEAR(aOrbit.state(123.0).mVel.norm(), n * k.mA, 1e-6);
    const double d = 6370000.0, phi = 0.01;
    const CSimVec3 P{d * std::cos(phi), d * std::sin(phi), 0.0};
    const CSimGeometry g(aOrbit, kLambda, 0.0);
    const double t0 = phi / n;
    EXPECT_NEAR(g.zeroDopplerTime(P, 0.0), t0, 1e-9);
    EXPECT_NEAR(g.range(t0, P), k.mA - d, 1e-6);
    // R^2 = a^2 + d^2 - 2 a d cos(n t - phi): at zero Doppler R R'' = a d n^2.
    const double aVr = n * std::sqrt(k.mA * d);
    EXPECT_NEAR(g.effectiveVelocityAtZeroDoppler(P, t0), aVr, 1e-4);
    for (double t : {t0 - 1.0, t0 + 0.5}) {
        const double aAngle = n * t - phi;
        EXPECT_NEAR(g.range(t, P), std::sqrt(k.mA * k.mA + d * d - 2.0 * k.mA * d * std::cos(aAngle)), 1e-6);
    }
}

TEST(SimGeometry, EarthFixedVelocityIsTheDerivativeOfEarthFixedPosition)
{
    CSimKepler k;  // an ERS-like orbit, Earth rotating
    k.mRaan = 1.1;
    k.mM0 = 0.7;
    k.mThetaG0 = 2.3;
    const CSimKeplerOrbit aOrbit(k);
    for (double t : {-40.0, 0.0, 17.5}) {
        const double h = 1e-3;
        const CSimVec3 aDiff = (aOrbit.state(t + h).mPos - aOrbit.state(t - h).mPos) / (2.0 * h);
        EXPECT_LT((aDiff - aOrbit.state(t).mVel).norm(), 1e-4);
    }
    // An orbit by state vectors sampled from it reproduces it between the vectors.
    std::vector<double> aTimes;
    for (int i = 0; i < 9; ++i) aTimes.push_back(-60.0 + 15.0 * i);
    const CSimVectorOrbit aVectors(aTimes, fqorvSimSampleOrbit(aOrbit, -60.0, 15.0, 9));
    for (double t : {-52.3, 0.1, 33.3}) {
        EXPECT_LT((aVectors.state(t).mPos - aOrbit.state(t).mPos).norm(), 1e-4);
        EXPECT_LT((aVectors.state(t).mVel - aOrbit.state(t).mVel).norm(), 1e-6);
    }
}

TEST(SimGeometry, PlacedOrbitSeesTheCentreAndLocateInvertsZeroDopplerGeometry)
{
    struct Case {
        double lat, lon, inc;
        int side;
        bool ascending;
    };
    for (const Case c : {Case{44.5, 11.3, 23.0, 1, false}, Case{-33.9, 151.2, 38.7, 1, true},
                         Case{60.1, -20.0, 30.0, -1, false}}) {
        CSimKepler k;
        const CSimVec3 aCentre = fqorvSimGeodeticToEcef(CQORV_SIM_WGS84, c.lat * CQORV_SIM_DEG, c.lon * CQORV_SIM_DEG, 0.0);
        ASSERT_TRUE(fqorvSimPlaceOrbit(k, aCentre, c.inc * CQORV_SIM_DEG, c.side, c.ascending, CQORV_SIM_WGS84));
        const CSimKeplerOrbit aOrbit(k);
        const CSimGeometry g(aOrbit, kLambda, 250.0);
        EXPECT_NEAR(g.zeroDopplerTime(aCentre, 0.0), 0.0, 1e-8);
        const CSimState s = aOrbit.state(0.0);
        EXPECT_NEAR(fqorvSimIncidenceAngle(s.mPos, aCentre, CQORV_SIM_WGS84) / CQORV_SIM_DEG, c.inc, 1e-8);
        EXPECT_EQ(fqorvSimLookSide(s, aCentre), c.side);
        const double aHeading = fqorvSimHeading(aCentre, s.mVel, CQORV_SIM_WGS84);
        EXPECT_EQ(aHeading > 270.0 || aHeading < 90.0, c.ascending) << aHeading;

        // The ground point of (time, range, height) is seen at zero Doppler at that range.
        for (double h : {0.0, 850.0}) {
            const double t = 0.8, r = g.range(0.0, aCentre) + 4000.0;
            const CSimVec3 P = g.locate(t, r, h, c.side, CQORV_SIM_WGS84);
            EXPECT_NEAR(g.zeroDopplerTime(P, 0.0), t, 1e-9);
            EXPECT_NEAR(g.range(t, P), r, 1e-5);
            double la, lo, hh;
            fqorvSimEcefToGeodetic(CQORV_SIM_WGS84, P, la, lo, hh);
            EXPECT_NEAR(hh, h, 1e-5);
            EXPECT_EQ(fqorvSimLookSide(aOrbit.state(t), P), c.side);
        }
    }
}

TEST(SimGeodesy, DatesAndGreenwichAngle)
{
    CSimUtc u;
    ASSERT_TRUE(fqorvSimParseIsoDate("1999-12-31T23:59:59.9999996", u));
    EXPECT_EQ(fqorvSimHeaderDate(u), "01-JAN-2000 00:00:00.000000");  // the carry reaches the year
    ASSERT_TRUE(fqorvSimParseIsoDate("1997-03-15T09:41:27.25", u));
    EXPECT_EQ(fqorvSimHeaderDate(u.plus(-1.060841110570121)), "15-MAR-1997 09:41:26.189159");
    EXPECT_EQ(fqorvSimHeaderDate(u.plus(-86400.0 * 15)), "28-FEB-1997 09:41:27.250000");
    EXPECT_EQ(u.mDay, 9935);  // days since 1970-01-01
    EXPECT_FALSE(fqorvSimParseIsoDate("1997-13-15T09:41:27", u));
    EXPECT_FALSE(fqorvSimParseIsoDate("15-MAR-1997 09:41:27", u));

    // The Earth rotation angle at J2000.0 (2000-01-01 12:00 UT1) is 280.46 degrees, and it gains
    // 360.9856 degrees a solar day.
    ASSERT_TRUE(fqorvSimParseIsoDate("2000-01-01T12:00:00", u));
    EXPECT_NEAR(fqorvSimGreenwichAngle(u) / CQORV_SIM_DEG, 280.46061837504, 1e-6);
    EXPECT_NEAR(std::remainder(fqorvSimGreenwichAngle(u.plus(86400.0)) - fqorvSimGreenwichAngle(u), 2 * CQORV_SIM_PI) /
                    CQORV_SIM_DEG,
                0.985612288, 1e-6);
}

TEST(SimTimeline, PulseTimesRecordsAndCodesFollowTheFaults)
{
    CSimScene s;
    ASSERT_TRUE(fqorvSimApplyPreset(s, "ers2", false));
    s.mPulses = 40;
    s.mStartTime = 10.0;
    s.mTauFirst = 5.6e-3;
    s.mSwstCode0 = 1200;
    s.mRadar.mPrf = fqorvSimPrfOfCode(s.mPrefix, s.mRadar.mSamplingRate, 2820);
    s.mCounter0 = 4294967290LL;  // the 32-bit counter wraps
    s.mFaults.mDroppedPulses = {5, 6, 30};
    s.mFaults.mRepeatedPulses = {9};
    s.mFaults.mSwstChanges = {{20, 22}, {25, -44}};
    s.mFaults.mPrfChanges = {{10, 2800}};
    const CSimTimeline tl(s);

    const double aPri0 = 2822 * 210.94e-9, aPri1 = 2802 * 210.94e-9;
    EXPECT_NEAR(tl.pulseTime(9), 10.0 + 9 * aPri0, 1e-12);
    EXPECT_NEAR(tl.pulseTime(17), 10.0 + 10 * aPri0 + 7 * aPri1, 1e-12);
    EXPECT_NEAR(tl.fractionalPulse(tl.pulseTime(17) + 0.25 * aPri1), 17.25, 1e-9);
    EXPECT_NEAR(tl.timeOfPulse(3.5), 10.0 + 3.5 * aPri0, 1e-12);
    EXPECT_NEAR(tl.fractionalPulse(9.0), -1.0 / aPri0, 1e-6);  // extended before the first pulse

    // The window moves up 22 codes and then down 44: 88 samples earlier than at first.
    EXPECT_EQ(tl.swstCode(25), 1178);
    EXPECT_NEAR(tl.windowDelay(26), 5.6e-3 - 88 / 18.96e6, 1e-15);

    // 40 pulses, 3 dropped, 1 repeated; the counter wraps: 4294967290 + 7 is 1.
    ASSERT_EQ(tl.records().size(), 38u);
    EXPECT_EQ(tl.records()[5].mCounter, 1u);
    EXPECT_TRUE(tl.records()[8].mRepeat);
    EXPECT_EQ(tl.recordOfPulse(6), -1);
    EXPECT_EQ(tl.recordOfPulse(10), 9);
}

}  // namespace
