// The orbit against the simulator's exact Kepler orbit, and the orbit kernels against closed
// forms: interpolators, differences, dates, Earth model, frame rotation.
#include <cmath>
#include <vector>

#include <gtest/gtest.h>

#include "geometry_test_util.h"
#include "qorv_date.h"
#include "qorv_orbit_utility.h"
#include "qorv_sim_geodesy.h"
#include "qorvex_test_support.h"

namespace {

class Orbit : public ::testing::Test {
protected:
    qtest::InProcessEnvironment mEnv;
};

/// Rows of the orbit built from a simulated header agree with the exact orbit at each line time.
void checkAgainstSimulator(const char* thePreset, long thePulses)
{
    CSimProductHeader p(thePreset, thePulses, 1024);
    YDF_ORBIT o;
    o.orbit(nullptr, 0.0f, false, p.mHeader.get(), 0, 1);
    ASSERT_EQ(o.mNrOfLines, (*p.mHeader)["RasterInfo.NrOfLinesPerImage"].getInteger());
    double aPosErr = 0.0, aVelErr = 0.0;
    for (int k = 0; k < o.mNrOfLines; k += 97) {
        const CSimState s = p.mOrbit->state(p.mTimeline->pulseTime(k));
        aPosErr = std::max({aPosErr, std::fabs(o.x[k] - s.mPos.x), std::fabs(o.y[k] - s.mPos.y),
                            std::fabs(o.z[k] - s.mPos.z)});
        aVelErr = std::max({aVelErr, std::fabs(o.vx[k] - s.mVel.x), std::fabs(o.vy[k] - s.mVel.y),
                            std::fabs(o.vz[k] - s.mVel.z)});
    }
    EXPECT_LT(aPosErr, 1.0) << thePreset;
    EXPECT_LT(aVelErr, 0.01) << thePreset;
    // The row times step by one line time from the image start.
    EXPECT_NEAR(o.ti[1] - o.ti[0], 1.0 / (*p.mHeader)["ChannelInfo.PRF"].getDouble(0), 1e-9);
    // Heading and pass as the simulator placed the orbit (ERS/ENVISAT descending, ALOS ascending).
    EXPECT_STREQ(fqorvOrbitConfiguration(o.mHeading), p.mScene.mAscending ? "ASCENDING" : "DESCENDING");
}

TEST_F(Orbit, RowsAgreeWithTheSimulatorsKeplerOrbit)
{
    checkAgainstSimulator("ers2", 3000);
    checkAgainstSimulator("envisat", 2000);
    checkAgainstSimulator("alos", 2000);
}

/// Largest position error (m) of an orbit's rows against the exact orbit.
double maxPositionError(const YDF_ORBIT& o, const CSimProductHeader& p)
{
    double e = 0.0;
    for (int k = 0; k < o.mNrOfLines; k += 101) {
        const CSimState s = p.mOrbit->state(p.mTimeline->pulseTime(0) + k * (o.ti[1] - o.ti[0]));
        e = std::max({e, std::fabs(o.x[k] - s.mPos.x), std::fabs(o.y[k] - s.mPos.y), std::fabs(o.z[k] - s.mPos.z)});
    }
    return e;
}

TEST_F(Orbit, OtherInterpolatorsAndTwoRowsPerLine)
{
    // Five vectors around the scene: least squares of degree 4 (Neville needs more than five).
    CSimProductHeader p("ers2", 1500, 1024);
    CDescriptionHeader& h = *p.mHeader;
    const int n = h["StateVectorData.nStateVectors"].getInteger();
    const int aFirst = (n - 5) / 2;
    CQorvDate d = fqorvParseDateField(h["StateVectorData.TimeFirst"].getString(), "TimeFirst");
    d.set(d.dayNumber(), d.secondsOfDay() + aFirst * h["StateVectorData.TimeDelta"].getDouble());
    h["StateVectorData.TimeFirst"].setValue(d.text());
    for (const char* aKey : {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z"}) {
        std::vector<double> v(5);
        for (int i = 0; i < 5; ++i) v[i] = h[aKey].getDouble(aFirst + i);
        h[aKey].resize(1, 5);
        for (int i = 0; i < 5; ++i) h[aKey].setValue(i, v[i]);
    }
    h["StateVectorData.nStateVectors"].setValue(5);
    YDF_ORBIT o;
    o.orbit(nullptr, 0.0f, false, &h, 0, 1);
    EXPECT_TRUE(o.mPolynomial && !o.mNewMethod);
    EXPECT_LT(maxPositionError(o, p), 0.01);
    // SIR-C always takes the tension spline.
    h["Sensor.SensorName"].setValue("SIR-C");
    YDF_ORBIT aSpline;
    aSpline.orbit(nullptr, 0.0f, false, &h, 0, 1);
    EXPECT_FALSE(aSpline.mPolynomial);
    EXPECT_LT(maxPositionError(aSpline, p), 2.0);  // the coarser interpolator: about 0.5 m here
    // Two rows per line: twice the rows at half the line time, velocities still per whole line.
    h["Sensor.SensorName"].setValue("ERS-2");
    YDF_ORBIT o2;
    o2.orbit(nullptr, 0.0f, false, &h, 0, 2);
    EXPECT_EQ(o2.mNrOfLines, 2 * o.mNrOfLines);
    EXPECT_NEAR(o2.x[2 * 600], o.x[600], 1.0);
    EXPECT_NEAR(o2.vx[2 * 600], 0.5 * o.vx[600], 1e-3);
}

TEST_F(Orbit, SceneCentreAndHeadingAreWrittenWhenMissing)
{
    CSimProductHeader p("ers2", 1500, 1024);
    CDescriptionHeader& h = *p.mHeader;
    const double aLat = h["RegistrationCoordinates.LatNorthing"].getDouble();
    const double aLon = h["RegistrationCoordinates.LonEasting"].getDouble();
    h["RegistrationCoordinates.LatNorthing"].reset();
    h["InitialGeometry.SceneHeading"].reset();
    YDF_ORBIT o;
    o.orbit(nullptr, 0.0f, false, &h, 0, 1);
    // Descending pass: vz < 0 gives 195 degrees; the estimate lands within a few tens of km.
    EXPECT_EQ(h["InitialGeometry.SceneHeading"].getDouble(), 195.0);
    EXPECT_STREQ(h["InitialGeometry.OrbitConfiguration"].getString(), "DESCENDING");
    EXPECT_NEAR(h["RegistrationCoordinates.LatNorthing"].getDouble(), aLat, 0.5);
    EXPECT_NEAR(h["RegistrationCoordinates.LonEasting"].getDouble(), aLon, 0.5);
    std::string aZone;
    ASSERT_TRUE(fqorvGetUserKey(h, "UTM_ZONE", aZone));
    EXPECT_EQ(aZone, std::to_string(fqorvUtmZone(h["RegistrationCoordinates.LonEasting"].getDouble())));
    // Mean altitude: the ERS orbit is about 780 km up.
    EXPECT_NEAR(o.meanAltitude(h), 785000.0, 15000.0);
}

TEST_F(Orbit, InertialVectorsAreRotatedToEarthFixed)
{
    CSimProductHeader p("ers2", 1500, 1024);
    CDescriptionHeader& h = *p.mHeader;
    YDF_ORBIT aTruth;
    aTruth.orbit(nullptr, 0.0f, false, &h, 0, 1);
    // Make the vectors inertial by the inverse rotation, then let the build rotate them back.
    const CQorvDate aFirst = fqorvParseDateField(h["StateVectorData.TimeFirst"].getString(), "TimeFirst");
    const long aDays = aFirst.dayNumber() - fqorvDaysFromCivil(1975, 1, 1);
    const int n = h["StateVectorData.nStateVectors"].getInteger();
    for (int i = 0; i < n; ++i) {
        double x = h["StateVectorData.pos_x"].getDouble(i), y = h["StateVectorData.pos_y"].getDouble(i);
        fqorvRotateInertialToEarthFixed(-fqorvGreenwichAngle(aDays, aFirst.secondsOfDay() + i * h["StateVectorData.TimeDelta"].getDouble()), x, y);
        h["StateVectorData.pos_x"].setValue(i, x);
        h["StateVectorData.pos_y"].setValue(i, y);
    }
    h["StateVectorData.StateVectorReference"].setValue("IRS");
    YDF_ORBIT o;
    o.orbit(nullptr, 0.0f, false, &h, 0, 1);
    EXPECT_STREQ(h["StateVectorData.StateVectorReference"].getString(), "ECR");
    EXPECT_NEAR(o.x[700], aTruth.x[700], 1e-3);
    EXPECT_NEAR(o.y[700], aTruth.y[700], 1e-3);
    EXPECT_NEAR(h["InitialGeometry.MeanAltitude"].getDouble(), 785000.0, 15000.0);
}

TEST(OrbitKernels, NevilleWindowAndSplineEnds)
{
    // Ten samples of a degree-9 polynomial: all ten points reproduce it, a 9-point window cannot.
    auto f = [](double t) { return std::pow(t - 4.5, 9) * 1e-3 + t; };
    std::vector<double> t(10), y(10);
    for (int i = 0; i < 10; ++i) {
        t[i] = i;
        y[i] = f(i);
    }
    const double tq[2] = {0.5, 8.5};
    double aAll[2], aWin[2];
    fqorv_pol_interp(t.data(), y.data(), 10, 0, tq, 2, aAll);
    fqorv_pol_interp(t.data(), y.data(), 10, 9, tq, 2, aWin);
    EXPECT_NEAR(aAll[0], f(0.5), 1e-9);
    EXPECT_NEAR(aAll[1], f(8.5), 1e-9);
    EXPECT_GT(std::fabs(aWin[0] - f(0.5)), 1e-3);
    // A cubic is reproduced exactly by any window of 9 and by the least-squares fit of degree 3.
    for (int i = 0; i < 10; ++i) y[i] = 2.0 - t[i] + 0.5 * t[i] * t[i] * t[i];
    fqorv_pol_interp(t.data(), y.data(), 10, 9, tq, 2, aWin);
    const std::vector<double> aLs = fqorvLeastSquaresPolynomial(t.data(), y.data(), 10, 3, tq, 2);
    for (int j = 0; j < 2; ++j) {
        const double e = 2.0 - tq[j] + 0.5 * tq[j] * tq[j] * tq[j];
        EXPECT_NEAR(aWin[j], e, 1e-9);
        EXPECT_NEAR(aLs[j], e, 1e-7);
    }
    // Spline: two knots give the straight line (zero end curvature); knots are interpolated.
    const double t2[2] = {10.0, 20.0}, y2[2] = {1.0, 3.0}, q2[3] = {10.0, 12.5, 20.0};
    const std::vector<double> aLine = fqorvTensionSpline(t2, y2, 2, q2, 3);
    EXPECT_NEAR(aLine[1], 1.5, 1e-12);
    EXPECT_NEAR(aLine[2], 3.0, 1e-12);
    for (int i = 0; i < 10; ++i) y[i] = std::sin(0.3 * t[i]);
    const std::vector<double> aS = fqorvTensionSpline(t.data(), y.data(), 10, t.data(), 10);
    for (int i = 0; i < 10; ++i) EXPECT_NEAR(aS[i], y[i], 1e-12);
    const double q = 4.5;
    EXPECT_NEAR(fqorvTensionSpline(t.data(), y.data(), 10, &q, 1)[0], std::sin(1.35), 2e-3);
}

TEST(OrbitKernels, DerivIsExactForQuadraticsAtTheEnds)
{
    std::vector<double> a(6);
    for (int i = 0; i < 6; ++i) a[i] = 3.0 * i * i - 2.0 * i + 1.0;
    const std::vector<double> d = deriv(a);
    for (int i = 0; i < 6; ++i) EXPECT_NEAR(d[i], 6.0 * i - 2.0, 1e-12) << i;
}

TEST(OrbitKernels, DatesParseWithPaddingAndRollOver)
{
    CQorvDate d;
    ASSERT_TRUE(d.parse("21-MAR-1996 10:15:42.123456"));
    EXPECT_EQ(d.dayNumber(), fqorvSimDaysFromCivil(1996, 3, 21));
    EXPECT_NEAR(d.secondsOfDay(), 36942.123456, 1e-9);
    ASSERT_TRUE(d.parse(" 1-MAR-2000 00:00:00.000000"));  // blank-padded day, leap year
    EXPECT_EQ(d.dayNumber(), fqorvSimDaysFromCivil(2000, 3, 1));
    EXPECT_EQ(d.dayOfYear(), 61);
    ASSERT_TRUE(d.parse("01-JAN-2 01 00:00:00.000000"));  // a blank in the year is a zero
    EXPECT_EQ(d.mYear, 2001);
    EXPECT_FALSE(d.parse("31-DEC-1969 23:59:59.000000"));
    EXPECT_FALSE(d.parse("01-JAN-2101 00:00:00.000000"));
    EXPECT_FALSE(d.parse("01-Jan-2001 00:00:00.000000"));
    EXPECT_TRUE(d.parse("01-JAN-2100 00:00:00.000000"));
    d.set(fqorvDaysFromCivil(1999, 12, 31), 86400.5);  // past midnight: the next day
    EXPECT_EQ(d.text(), "01-JAN-2000 00:00:00.500000");
}

TEST(OrbitKernels, EarthModelAndGreenwichAngle)
{
    // Geodetic -> ECEF by the simulator, back by ours.
    for (double aLatDeg : {0.0, 45.0, -67.5, 89.9}) {
        const CSimVec3 p = fqorvSimGeodeticToEcef(CQORV_SIM_WGS84, aLatDeg * CQORV_SIM_DEG, 2.0, 790000.0);
        double aLat, aLon, h;
        fqorvCartesianToGeodetic(p.x, p.y, p.z, aLat, aLon, h);
        EXPECT_NEAR(aLat, aLatDeg * CQORV_SIM_DEG, 1e-11);
        EXPECT_NEAR(aLon, 2.0, 1e-12);
        EXPECT_NEAR(h, 790000.0, 1e-4);
    }
    // Greenwich angle at 1 January 2000, 12:00 UT: the mean sidereal time 280.4606 degrees.
    const long aDays = fqorvDaysFromCivil(2000, 1, 1) - fqorvDaysFromCivil(1975, 1, 1);
    EXPECT_NEAR(fqorvGreenwichAngle(aDays, 43200.0) * 57.29577951308232, 280.4606, 0.01);
    EXPECT_NEAR(fqorvGreenwichAngle(aDays - 1, 86400.0 + 43200.0), fqorvGreenwichAngle(aDays, 43200.0), 1e-12);
    // Rotation: x' = x cos + y sin, y' = y cos - x sin.
    double x = 1.0, y = 0.0;
    fqorvRotateInertialToEarthFixed(0.5, x, y);
    EXPECT_NEAR(x, std::cos(0.5), 1e-15);
    EXPECT_NEAR(y, -std::sin(0.5), 1e-15);
    EXPECT_STREQ(fqorvOrbitConfiguration(-10.0), "DESCENDING");
    EXPECT_STREQ(fqorvOrbitConfiguration(344.0), "ASCENDING");
    EXPECT_EQ(fqorvUtmZone(190.0), 2);
}

}  // namespace
