#include "qorv_sim_geometry.h"

#include <algorithm>

namespace {

/// Newton's method on a scalar function of time with a numerical derivative; the root near
/// theGuess to a tolerance of 1e-11 s.
template <typename F>
double solveTime(F theFunction, double theGuess, double theStep)
{
    double t = theGuess;
    for (int i = 0; i < 60; ++i) {
        const double f = theFunction(t);
        const double d = (theFunction(t + theStep) - theFunction(t - theStep)) / (2.0 * theStep);
        if (d == 0.0 || !std::isfinite(d)) break;
        double aStep = f / d;
        // Keep each step within a few seconds: the functions are near-linear over a scene but
        // a far first guess should not throw the search onto another orbit revolution.
        aStep = std::clamp(aStep, -5.0, 5.0);
        t -= aStep;
        if (std::fabs(aStep) < 1e-11) break;
    }
    return t;
}

}  // namespace

CSimGeometry::CSimGeometry(const CSimOrbit& theOrbit, double theWavelength, double theDopplerCentroid)
    : mOrbit(theOrbit), mWavelength(theWavelength), mDopplerCentroid(theDopplerCentroid)
{
}

double CSimGeometry::range(double theTime, const CSimVec3& thePoint) const
{
    return (thePoint - mOrbit.state(theTime).mPos).norm();
}

double CSimGeometry::doppler(double theTime, const CSimVec3& thePoint) const
{
    const CSimState s = mOrbit.state(theTime);
    const CSimVec3 d = thePoint - s.mPos;
    return 2.0 * s.mVel.dot(d) / (mWavelength * d.norm());
}

double CSimGeometry::dopplerRate(double theTime, const CSimVec3& thePoint) const
{
    const double h = 1e-3;
    return (doppler(theTime + h, thePoint) - doppler(theTime - h, thePoint)) / (2.0 * h);
}

double CSimGeometry::azimuthOffBeam(double theTime, const CSimVec3& thePoint) const
{
    const CSimState s = mOrbit.state(theTime);
    const CSimVec3 d = thePoint - s.mPos;
    const double v = s.mVel.norm();
    const double aSinAngle = s.mVel.dot(d) / (v * d.norm());
    const double aSinSquint = mWavelength * mDopplerCentroid / (2.0 * v);
    return std::asin(std::clamp(aSinAngle, -1.0, 1.0)) - std::asin(std::clamp(aSinSquint, -1.0, 1.0));
}

double CSimGeometry::zeroDopplerTime(const CSimVec3& thePoint, double theGuess) const
{
    return solveTime(
        [&](double t) {
            const CSimState s = mOrbit.state(t);
            return s.mVel.dot(thePoint - s.mPos) / s.mVel.norm();
        },
        theGuess, 1e-3);
}

double CSimGeometry::timeOfDoppler(const CSimVec3& thePoint, double theDoppler, double theGuess) const
{
    return solveTime([&](double t) { return doppler(t, thePoint) - theDoppler; }, theGuess, 1e-3);
}

double CSimGeometry::timeOfAzimuthAngle(const CSimVec3& thePoint, double thePsi, double theGuess) const
{
    return solveTime([&](double t) { return azimuthOffBeam(t, thePoint) - thePsi; }, theGuess, 1e-3);
}

double CSimGeometry::effectiveVelocityAtZeroDoppler(const CSimVec3& thePoint, double theZeroDopplerTime) const
{
    // With d = P - S: (d.d)'' = 2 (v.v - d.a) = 2 (R'^2 + R R''), and R' = 0 at zero Doppler, so
    // R0 R'' = v.v - d.a. The acceleration a by a central difference of the velocity.
    const double h = 0.01;
    const CSimState s = mOrbit.state(theZeroDopplerTime);
    const CSimVec3 a = (mOrbit.state(theZeroDopplerTime + h).mVel - mOrbit.state(theZeroDopplerTime - h).mVel) / (2.0 * h);
    return std::sqrt(s.mVel.dot(s.mVel) - (thePoint - s.mPos).dot(a));
}

double CSimGeometry::effectiveVelocityFit(const CSimVec3& thePoint, double theZeroDopplerTime, double theFrom,
                                          double theTo, int theCount) const
{
    const double r0 = range(theZeroDopplerTime, thePoint);
    double aNum = 0.0, aDen = 0.0;
    for (int i = 0; i < theCount; ++i) {
        const double t = theFrom + (theTo - theFrom) * i / (theCount - 1);
        const double r = range(t, thePoint);
        const double dt2 = (t - theZeroDopplerTime) * (t - theZeroDopplerTime);
        aNum += (r - r0) * (r + r0) * dt2;
        aDen += dt2 * dt2;
    }
    return aDen > 0.0 ? std::sqrt(aNum / aDen) : effectiveVelocityAtZeroDoppler(thePoint, theZeroDopplerTime);
}

CSimVec3 CSimGeometry::locate(double theTime, double theRange, double theHeight, int theLookSign,
                              const CSimEllipsoid& theEllipsoid) const
{
    const CSimState s = mOrbit.state(theTime);
    // First guess on a sphere through the satellite's nadir point.
    double aLat, aLon, aSatHeight;
    fqorvSimEcefToGeodetic(theEllipsoid, s.mPos, aLat, aLon, aSatHeight);
    const double rs = s.mPos.norm();
    const double re = fqorvSimGeodeticToEcef(theEllipsoid, aLat, aLon, theHeight).norm();
    const double aCosLook = std::clamp((rs * rs + theRange * theRange - re * re) / (2.0 * rs * theRange), -1.0, 1.0);
    const CSimVec3 up = s.mPos.unit();
    const CSimVec3 fwd = (s.mVel - up * s.mVel.dot(up)).unit();
    const CSimVec3 right = fwd.cross(up);
    const CSimVec3 g =
        s.mPos + (up * (-aCosLook) + right * (theLookSign * std::sqrt(1.0 - aCosLook * aCosLook))) * theRange;
    double lat, lon, h;
    fqorvSimEcefToGeodetic(theEllipsoid, g, lat, lon, h);

    // Newton on (lat, lon): range equal to theRange, along-track offset zero.
    const CSimVec3 vu = s.mVel.unit();
    auto residual = [&](double la, double lo, double& f1, double& f2) {
        const CSimVec3 p = fqorvSimGeodeticToEcef(theEllipsoid, la, lo, theHeight);
        f1 = (p - s.mPos).norm() - theRange;
        f2 = vu.dot(p - s.mPos);
    };
    const double d = 1e-7;
    for (int i = 0; i < 30; ++i) {
        double f1, f2, a1, a2, b1, b2;
        residual(lat, lon, f1, f2);
        residual(lat + d, lon, a1, a2);
        residual(lat, lon + d, b1, b2);
        const double j11 = (a1 - f1) / d, j21 = (a2 - f2) / d, j12 = (b1 - f1) / d, j22 = (b2 - f2) / d;
        const double det = j11 * j22 - j12 * j21;
        const double dLat = (f1 * j22 - f2 * j12) / det;
        const double dLon = (j11 * f2 - j21 * f1) / det;
        lat -= dLat;
        lon -= dLon;
        if (std::fabs(f1) < 1e-7 && std::fabs(f2) < 1e-7) break;
    }
    return fqorvSimGeodeticToEcef(theEllipsoid, lat, lon, theHeight);
}

double fqorvSimIncidenceAngle(const CSimVec3& theSatellite, const CSimVec3& thePoint, const CSimEllipsoid& theEllipsoid)
{
    double lat, lon, h;
    fqorvSimEcefToGeodetic(theEllipsoid, thePoint, lat, lon, h);
    const CSimVec3 n = fqorvSimEllipsoidNormal(lat, lon);
    return std::acos(std::clamp(n.dot((theSatellite - thePoint).unit()), -1.0, 1.0));
}

double fqorvSimLookAngle(const CSimVec3& theSatellite, const CSimVec3& thePoint)
{
    return std::acos(std::clamp((thePoint - theSatellite).unit().dot(theSatellite.unit() * -1.0), -1.0, 1.0));
}

double fqorvSimHeading(const CSimVec3& thePoint, const CSimVec3& theVelocity, const CSimEllipsoid& theEllipsoid)
{
    double lat, lon, h;
    fqorvSimEcefToGeodetic(theEllipsoid, thePoint, lat, lon, h);
    const CSimVec3 east{-std::sin(lon), std::cos(lon), 0.0};
    const CSimVec3 north{-std::sin(lat) * std::cos(lon), -std::sin(lat) * std::sin(lon), std::cos(lat)};
    double aHeading = std::atan2(theVelocity.dot(east), theVelocity.dot(north)) / CQORV_SIM_DEG;
    if (aHeading < 0.0) aHeading += 360.0;
    return aHeading;
}

int fqorvSimLookSide(const CSimState& theSatellite, const CSimVec3& thePoint)
{
    const CSimVec3 right = theSatellite.mVel.cross(theSatellite.mPos);
    return right.dot(thePoint - theSatellite.mPos) >= 0.0 ? 1 : -1;
}

bool fqorvSimPlaceOrbit(CSimKepler& theElements, const CSimVec3& theTarget, double theIncidence, int theLookSign,
                        bool theAscending, const CSimEllipsoid& theEllipsoid)
{
    // First guess: a sphere, with the satellite abeam of the target across the track.
    double lat, lon, h;
    fqorvSimEcefToGeodetic(theEllipsoid, theTarget, lat, lon, h);
    const double re = theTarget.norm();
    const double rs = theElements.mA;
    const double aLook = std::asin(re * std::sin(theIncidence) / rs);
    const double aCentral = theIncidence - aLook;
    const double aGeocLat = std::atan2(theTarget.z, std::hypot(theTarget.x, theTarget.y));
    const double aSinU = std::clamp(std::sin(aGeocLat) / std::sin(theElements.mInc), -1.0, 1.0);
    double u = theAscending ? std::asin(aSinU) : CQORV_SIM_PI - std::asin(aSinU);
    // On a near-polar orbit the right side of a descending pass is west, of an ascending one east.
    const double aSatLon = lon + theLookSign * (theAscending ? -1.0 : 1.0) * aCentral / std::cos(aGeocLat);
    const double aNodeOffset = std::atan2(std::cos(theElements.mInc) * std::sin(u), std::cos(u));
    double raan = aSatLon - aNodeOffset + theElements.mThetaG0;

    auto residual = [&](double theU, double theRaan, double& f1, double& f2) {
        CSimKepler k = theElements;
        k.mRaan = theRaan;
        k.mM0 = CSimKeplerOrbit::meanAnomalyForArgumentOfLatitude(k, theU);
        const CSimState s = CSimKeplerOrbit(k).state(0.0);
        const CSimVec3 d = theTarget - s.mPos;
        f1 = s.mVel.unit().dot(d) / d.norm();
        f2 = fqorvSimIncidenceAngle(s.mPos, theTarget, theEllipsoid) - theIncidence;
    };
    const double d = 1e-7;
    bool aConverged = false;
    for (int i = 0; i < 50; ++i) {
        double f1, f2, a1, a2, b1, b2;
        residual(u, raan, f1, f2);
        if (std::fabs(f1) < 1e-13 && std::fabs(f2) < 1e-13) {
            aConverged = true;
            break;
        }
        residual(u + d, raan, a1, a2);
        residual(u, raan + d, b1, b2);
        const double j11 = (a1 - f1) / d, j21 = (a2 - f2) / d, j12 = (b1 - f1) / d, j22 = (b2 - f2) / d;
        const double det = j11 * j22 - j12 * j21;
        if (det == 0.0) return false;
        const double du = std::clamp((f1 * j22 - f2 * j12) / det, -0.05, 0.05);
        const double dr = std::clamp((j11 * f2 - j21 * f1) / det, -0.05, 0.05);
        u -= du;
        raan -= dr;
        if (std::fabs(du) < 1e-14 && std::fabs(dr) < 1e-14) {
            aConverged = true;
            break;
        }
    }
    theElements.mRaan = std::remainder(raan, 2.0 * CQORV_SIM_PI);
    if (theElements.mRaan < 0.0) theElements.mRaan += 2.0 * CQORV_SIM_PI;
    theElements.mM0 = CSimKeplerOrbit::meanAnomalyForArgumentOfLatitude(theElements, u);
    const CSimState s = CSimKeplerOrbit(theElements).state(0.0);
    return aConverged && fqorvSimLookSide(s, theTarget) == theLookSign;
}
