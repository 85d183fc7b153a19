// State-vector orbits: Hermite interpolation, propagation of a single vector with J2, and the
// zero-Doppler geometry of a slant range.
#include "qorv_state_vectors.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <numeric>
#include <stdexcept>
#include <utility>

#include "qorv_orbit_utility.h"

namespace {

constexpr double kPi = 3.14159265358979323846;
constexpr double kDeg = 180.0 / kPi;

using Vec3 = std::array<double, 3>;

Vec3 load(const double* theV) { return {theV[0], theV[1], theV[2]}; }
Vec3 operator+(const Vec3& a, const Vec3& b) { return {a[0] + b[0], a[1] + b[1], a[2] + b[2]}; }
Vec3 operator-(const Vec3& a, const Vec3& b) { return {a[0] - b[0], a[1] - b[1], a[2] - b[2]}; }
Vec3 operator*(double s, const Vec3& a) { return {s * a[0], s * a[1], s * a[2]}; }
double dot(const Vec3& a, const Vec3& b) { return a[0] * b[0] + a[1] * b[1] + a[2] * b[2]; }
double norm(const Vec3& a) { return std::sqrt(dot(a, a)); }
Vec3 unit(const Vec3& a) { return (1.0 / norm(a)) * a; }
Vec3 cross(const Vec3& a, const Vec3& b)
{
    return {a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2], a[0] * b[1] - a[1] * b[0]};
}

// ------------------------------------------------------------------------------------------------
// Interpolation. Four vectors give a polynomial of degree 7 through four positions and four
// velocities; on a low Earth orbit its error is far below a millimetre up to a minute's spacing,
// while more vectors would only widen the reach of noise in real orbits.

constexpr int kHermiteVectors = 4;

/// The Hermite polynomial through theCount vectors from theNodes, evaluated with its first two
/// derivatives at theTime. Newton form on doubled nodes, in a time scaled to [-1, 1] over the
/// nodes so that the divided differences stay well conditioned.
COrbitState hermite(const CStateVector* theNodes, int theCount, double theTime)
{
    const int m = 2 * theCount;
    const double aCentre = 0.5 * (theNodes[0].mTime + theNodes[theCount - 1].mTime);
    const double aHalf = 0.5 * (theNodes[theCount - 1].mTime - theNodes[0].mTime);
    std::array<double, 2 * kHermiteVectors> z{};
    for (int i = 0; i < theCount; ++i) z[2 * i] = z[2 * i + 1] = (theNodes[i].mTime - aCentre) / aHalf;
    const double s = (theTime - aCentre) / aHalf;

    COrbitState aState;
    for (int c = 0; c < 3; ++c) {
        std::array<double, 2 * kHermiteVectors> f{};
        for (int i = 0; i < theCount; ++i) f[2 * i] = f[2 * i + 1] = theNodes[i].mPosition[c];
        // First differences: the velocity (per scaled time unit) on a doubled node.
        for (int k = m - 1; k >= 1; --k) {
            f[k] = (k % 2 == 1) ? theNodes[k / 2].mVelocity[c] * aHalf : (f[k] - f[k - 1]) / (z[k] - z[k - 1]);
        }
        for (int l = 2; l < m; ++l) {
            for (int k = m - 1; k >= l; --k) f[k] = (f[k] - f[k - 1]) / (z[k] - z[k - l]);
        }
        // Horner's rule carrying the first and second derivatives.
        double p = f[m - 1], p1 = 0.0, p2 = 0.0;
        for (int k = m - 2; k >= 0; --k) {
            const double d = s - z[k];
            p2 = p2 * d + 2.0 * p1;
            p1 = p1 * d + p;
            p = p * d + f[k];
        }
        aState.mPosition[c] = p;
        aState.mVelocity[c] = p1 / aHalf;
        aState.mAcceleration[c] = p2 / (aHalf * aHalf);
    }
    return aState;
}

// ------------------------------------------------------------------------------------------------
// Propagation, in the inertial frame that coincides with the Earth-fixed one at the vector's time.
// J2 is symmetric about the z axis, which both frames share, so the field needs no rotation.

/// Longest integration step (s): the fourth-order Runge-Kutta scheme then keeps a low orbit well
/// within a millimetre over several minutes.
constexpr double kMaxStep = 1.0;

struct CInertialState {
    Vec3 r;
    Vec3 v;
};

Vec3 gravity(const Vec3& r, double theJ2)
{
    const double r2 = dot(r, r);
    const double aR = std::sqrt(r2);
    const double aCentral = -CQORV_WGS84_GM / (r2 * aR);
    const double k = 1.5 * theJ2 * CQORV_WGS84_A * CQORV_WGS84_A / r2;
    const double q = 5.0 * r[2] * r[2] / r2;
    const double aEquatorial = aCentral * (1.0 + k * (1.0 - q));
    return {aEquatorial * r[0], aEquatorial * r[1], aCentral * (1.0 + k * (3.0 - q)) * r[2]};
}

CInertialState rungeKuttaStep(const CInertialState& x, double h, double theJ2)
{
    const Vec3 a1 = gravity(x.r, theJ2);
    const Vec3 r2 = x.r + (0.5 * h) * x.v, v2 = x.v + (0.5 * h) * a1;
    const Vec3 a2 = gravity(r2, theJ2);
    const Vec3 r3 = x.r + (0.5 * h) * v2, v3 = x.v + (0.5 * h) * a2;
    const Vec3 a3 = gravity(r3, theJ2);
    const Vec3 r4 = x.r + h * v3, v4 = x.v + h * a3;
    const Vec3 a4 = gravity(r4, theJ2);
    return {x.r + (h / 6.0) * (x.v + 2.0 * v2 + 2.0 * v3 + v4), x.v + (h / 6.0) * (a1 + 2.0 * a2 + 2.0 * a3 + a4)};
}

/// Earth-fixed state theElapsed seconds after the frames coincided: the inertial state rotated
/// back by the Earth's turn, its velocity taken relative to the rotating Earth.
void toEarthFixed(const CInertialState& x, double theElapsed, CStateVector& theOut)
{
    const double w = CQORV_EARTH_ROTATION_RATE;
    const double c = std::cos(w * theElapsed), s = std::sin(w * theElapsed);
    const Vec3 v = {x.v[0] + w * x.r[1], x.v[1] - w * x.r[0], x.v[2]};
    theOut.mPosition[0] = c * x.r[0] + s * x.r[1];
    theOut.mPosition[1] = -s * x.r[0] + c * x.r[1];
    theOut.mPosition[2] = x.r[2];
    theOut.mVelocity[0] = c * v[0] + s * v[1];
    theOut.mVelocity[1] = -s * v[0] + c * v[1];
    theOut.mVelocity[2] = v[2];
}

// ------------------------------------------------------------------------------------------------
// Zero-Doppler geometry.

/// Outward normal of the WGS-84 ellipsoid at geodetic latitude and longitude (rad).
Vec3 ellipsoidNormal(double theLat, double theLon)
{
    return {std::cos(theLat) * std::cos(theLon), std::cos(theLat) * std::sin(theLon), std::sin(theLat)};
}

/// The target at theHeight seen from theSatellite (position, velocity) at theRange in the
/// zero-Doppler plane. The plane is spanned by the nadir direction freed of its along-track part
/// (e1) and the side direction (e2, to the right of the track for look sign +1); along the circle
/// P(a) = S + R (cos a e1 + sin a e2) the height above the ellipsoid grows from a = 0 (straight
/// down) to a = pi/2 (level with the satellite), so one root lies between when the range reaches
/// the surface. Newton on a with the exact slope dh/da = n.dP/da, kept inside a shrinking bracket.
bool solveZeroDopplerTarget(const Vec3& theSatellite, const Vec3& theVelocity, double theRange, double theHeight,
                            int theLookSign, Vec3& theTarget)
{
    const double aSpeed = norm(theVelocity);
    if (!(aSpeed > 0.0) || !(theRange > 0.0) || (theLookSign != 1 && theLookSign != -1)) return false;
    const Vec3 vHat = (1.0 / aSpeed) * theVelocity;
    const Vec3 aDown = -1.0 * theSatellite;
    const Vec3 e1 = unit(aDown - dot(aDown, vHat) * vHat);
    const Vec3 e2 = static_cast<double>(theLookSign) * cross(e1, vHat);

    auto pointAt = [&](double a) { return theSatellite + theRange * (std::cos(a) * e1 + std::sin(a) * e2); };
    auto heightAt = [&](double a, double& theSlope) {
        const Vec3 p = pointAt(a);
        double aLat, aLon, h;
        fqorvCartesianToGeodetic(p[0], p[1], p[2], aLat, aLon, h);
        theSlope = theRange * dot(ellipsoidNormal(aLat, aLon), -std::sin(a) * e1 + std::cos(a) * e2);
        return h - theHeight;
    };

    double aLow = 0.0, aHigh = 0.5 * kPi, aSlope = 0.0;
    if (heightAt(aLow, aSlope) > 0.0) return false;  // the range ends above the surface
    // Start from a sphere of the radius below the satellite: the law of cosines.
    double aLat, aLon, aSatHeight;
    fqorvCartesianToGeodetic(theSatellite[0], theSatellite[1], theSatellite[2], aLat, aLon, aSatHeight);
    const double rs = norm(theSatellite);
    const double re = rs - aSatHeight + theHeight;
    const double rsPerp = -dot(theSatellite, e1);
    double a = std::acos(std::clamp((rsPerp * rsPerp + theRange * theRange - re * re) / (2.0 * rsPerp * theRange),
                                    0.0, 1.0));
    for (int i = 0; i < 60; ++i) {
        const double f = heightAt(a, aSlope);
        (f < 0.0 ? aLow : aHigh) = a;
        double aNext = aSlope > 0.0 ? a - f / aSlope : 0.5 * (aLow + aHigh);
        if (!(aNext > aLow && aNext < aHigh)) aNext = 0.5 * (aLow + aHigh);
        const double aStep = std::fabs(aNext - a);
        a = aNext;
        if (aStep * theRange < 1e-7) break;
    }
    theTarget = pointAt(a);
    return true;
}

}  // namespace

// ------------------------------------------------------------------------------------------------

CStateVectorOrbit::CStateVectorOrbit(std::vector<CStateVector> theVectors) : mVectors(std::move(theVectors))
{
    if (mVectors.size() < 2) throw std::invalid_argument("an orbit needs at least two state vectors");
    for (std::size_t i = 1; i < mVectors.size(); ++i) {
        if (!(mVectors[i].mTime > mVectors[i - 1].mTime)) {
            throw std::invalid_argument("state vector times must increase strictly");
        }
    }
}

COrbitState CStateVectorOrbit::at(double theTime) const
{
    // The vectors around theTime: two on each side where there are, the end ones otherwise.
    const int n = static_cast<int>(mVectors.size());
    const int aCount = std::min(n, kHermiteVectors);
    const auto aAfter = std::upper_bound(mVectors.begin(), mVectors.end(), theTime,
                                         [](double t, const CStateVector& v) { return t < v.mTime; });
    const int aInterval = static_cast<int>(aAfter - mVectors.begin()) - 1;
    const int aFirst = std::clamp(aInterval - (aCount / 2 - 1), 0, n - aCount);
    return hermite(&mVectors[static_cast<std::size_t>(aFirst)], aCount, theTime);
}

std::vector<CStateVector> CStateVectorOrbit::resample(double theFirst, double theStep, int theCount) const
{
    std::vector<CStateVector> aOut(static_cast<std::size_t>(std::max(theCount, 0)));
    for (int i = 0; i < theCount; ++i) {
        CStateVector& v = aOut[static_cast<std::size_t>(i)];
        v.mTime = theFirst + i * theStep;
        const COrbitState s = at(v.mTime);
        std::copy(s.mPosition, s.mPosition + 3, v.mPosition);
        std::copy(s.mVelocity, s.mVelocity + 3, v.mVelocity);
    }
    return aOut;
}

std::vector<CStateVector> fqorvPropagateStateVector(const CStateVector& theVector, const std::vector<double>& theTimes,
                                                    double theJ2)
{
    const double w = CQORV_EARTH_ROTATION_RATE;
    const Vec3 r0 = load(theVector.mPosition);
    const Vec3 v0 = load(theVector.mVelocity);
    // The inertial velocity adds the Earth's rotation, omega x r.
    const CInertialState aStart{r0, {v0[0] - w * r0[1], v0[1] + w * r0[0], v0[2]}};

    // Forward through the later times, then backward through the earlier ones, each in order, so
    // that every time continues the integration of the one before.
    std::vector<std::size_t> aOrder(theTimes.size());
    std::iota(aOrder.begin(), aOrder.end(), std::size_t{0});
    std::sort(aOrder.begin(), aOrder.end(), [&](std::size_t a, std::size_t b) { return theTimes[a] < theTimes[b]; });
    const auto aSplit = std::partition_point(aOrder.begin(), aOrder.end(),
                                             [&](std::size_t i) { return theTimes[i] < theVector.mTime; });

    std::vector<CStateVector> aOut(theTimes.size());
    auto propagate = [&](auto theBegin, auto theEnd) {
        CInertialState x = aStart;
        double t = theVector.mTime;
        for (auto it = theBegin; it != theEnd; ++it) {
            const double aTarget = theTimes[*it];
            const int aSteps = static_cast<int>(std::ceil(std::fabs(aTarget - t) / kMaxStep));
            const double h = aSteps > 0 ? (aTarget - t) / aSteps : 0.0;
            for (int k = 0; k < aSteps; ++k) x = rungeKuttaStep(x, h, theJ2);
            t = aTarget;
            aOut[*it].mTime = aTarget;
            toEarthFixed(x, aTarget - theVector.mTime, aOut[*it]);
        }
    };
    propagate(aSplit, aOrder.end());
    propagate(std::make_reverse_iterator(aSplit), aOrder.rend());
    return aOut;
}

bool fqorvZeroDopplerPoint(const CStateVectorOrbit& theOrbit, double theTime, double theRange, double theHeight,
                           int theLookSign, CZeroDopplerPoint& thePoint)
{
    const COrbitState s = theOrbit.at(theTime);
    const Vec3 aSatellite = load(s.mPosition);
    const Vec3 aVelocity = load(s.mVelocity);
    Vec3 p;
    if (!solveZeroDopplerTarget(aSatellite, aVelocity, theRange, theHeight, theLookSign, p)) return false;

    double aLat, aLon, h;
    fqorvCartesianToGeodetic(p[0], p[1], p[2], aLat, aLon, h);
    const Vec3 aNormal = ellipsoidNormal(aLat, aLon);
    const Vec3 aLine = unit(aSatellite - p);  // from the target to the satellite
    const Vec3 aEast = {-std::sin(aLon), std::cos(aLon), 0.0};
    const Vec3 aNorth = {-std::sin(aLat) * std::cos(aLon), -std::sin(aLat) * std::sin(aLon), std::cos(aLat)};

    std::copy(p.begin(), p.end(), thePoint.mTarget);
    thePoint.mLatitudeDeg = aLat * kDeg;
    thePoint.mLongitudeDeg = aLon * kDeg;
    thePoint.mIncidenceDeg = std::acos(std::clamp(dot(aNormal, aLine), -1.0, 1.0)) * kDeg;
    thePoint.mLookDeg = std::acos(std::clamp(dot(aLine, unit(aSatellite)), -1.0, 1.0)) * kDeg;
    // The track's direction at the target: the satellite's velocity in the target's horizon.
    double aHeading = std::atan2(dot(aVelocity, aEast), dot(aVelocity, aNorth)) * kDeg;
    if (aHeading < 0.0) aHeading += 360.0;
    thePoint.mHeadingDeg = aHeading;
    return true;
}

double fqorvEffectiveVelocity(const CStateVectorOrbit& theOrbit, double theTime, double theRange, double theHeight,
                              int theLookSign)
{
    CZeroDopplerPoint aPoint;
    if (!fqorvZeroDopplerPoint(theOrbit, theTime, theRange, theHeight, theLookSign, aPoint)) {
        return std::numeric_limits<double>::quiet_NaN();
    }
    // With d = P - S, (d.d)'' = 2 (v.v - d.a) = 2 (R'^2 + R R''), and R' = 0 at zero Doppler.
    const COrbitState s = theOrbit.at(theTime);
    const Vec3 d = load(aPoint.mTarget) - load(s.mPosition);
    const double aV2 = dot(load(s.mVelocity), load(s.mVelocity)) - dot(d, load(s.mAcceleration));
    return aV2 > 0.0 ? std::sqrt(aV2) : std::numeric_limits<double>::quiet_NaN();
}
