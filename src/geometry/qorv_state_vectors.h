// An orbit given by state vectors, as raw archives and orbit files deliver it: interpolation of
// position, velocity and acceleration between the vectors, propagation of a single vector, and the
// zero-Doppler geometry an importer needs to describe a scene (the ground point seen at a slant
// range, its incidence, the effective velocity of the range history there).
//
// Times are seconds from one reference instant chosen by the caller (an importer counts from the
// midnight of a reference day); positions in metres and velocities in m/s, Earth-fixed (WGS-84
// axes), velocities relative to the rotating Earth.
#pragma once

#include <vector>

/// The Earth's field and rotation of the propagation (WGS-84).
inline constexpr double CQORV_WGS84_GM = 3.986004418e14;        // m^3/s^2
inline constexpr double CQORV_WGS84_J2 = 1.08262668e-3;
inline constexpr double CQORV_EARTH_ROTATION_RATE = 7.2921151467e-5;  // rad/s

/// One state vector.
struct CStateVector {
    double mTime = 0.0;
    double mPosition[3] = {0.0, 0.0, 0.0};
    double mVelocity[3] = {0.0, 0.0, 0.0};
};

/// Position, velocity and acceleration at one time.
struct COrbitState {
    double mPosition[3] = {0.0, 0.0, 0.0};
    double mVelocity[3] = {0.0, 0.0, 0.0};
    double mAcceleration[3] = {0.0, 0.0, 0.0};
};

/// Interpolates an orbit through its state vectors with the positions and the velocities (Hermite
/// interpolation over a few neighbouring vectors), so that spacings from a few seconds (CEOS
/// leaders) to a minute (precise orbit files) stay within a millimetre on a low Earth orbit.
class CStateVectorOrbit {
public:
    /// At least two vectors with strictly increasing times; throws std::invalid_argument otherwise.
    explicit CStateVectorOrbit(std::vector<CStateVector> theVectors);

    /// The state at theTime; beyond the first or last vector the end polynomial is extended.
    COrbitState at(double theTime) const;

    double firstTime() const { return mVectors.front().mTime; }
    double lastTime() const { return mVectors.back().mTime; }
    const std::vector<CStateVector>& vectors() const { return mVectors; }

    /// theCount vectors every theStep seconds from theFirst.
    std::vector<CStateVector> resample(double theFirst, double theStep, int theCount) const;

private:
    std::vector<CStateVector> mVectors;
};

/// Propagates one state vector through the Earth's central field with its J2 term (WGS-84 GM,
/// J2 and rotation rate), in the inertial frame that coincides with the Earth-fixed frame at the
/// vector's time; returns the Earth-fixed states at theTimes (any order, before or after the vector).
/// theJ2 0 leaves the central field alone.
std::vector<CStateVector> fqorvPropagateStateVector(const CStateVector& theVector, const std::vector<double>& theTimes,
                                                    double theJ2 = CQORV_WGS84_J2);

/// The zero-Doppler geometry of one slant range at one time.
struct CZeroDopplerPoint {
    double mTarget[3] = {0.0, 0.0, 0.0};  // m, Earth-fixed: the point at theHeight above the ellipsoid
    double mLatitudeDeg = 0.0;
    double mLongitudeDeg = 0.0;            // -180 .. 180
    double mIncidenceDeg = 0.0;            // between the local ellipsoid normal and the line of sight
    double mLookDeg = 0.0;                 // off nadir (the geocentric direction), at the satellite
    double mHeadingDeg = 0.0;              // of the ground track, clockwise from north, 0 .. 360
};

/// The point at theHeight (m) above the WGS-84 ellipsoid seen at zero Doppler (line of sight
/// perpendicular to the Earth-fixed velocity) from the orbit at theTime at slant range theRange (m),
/// on the right of the track for theLookSign +1, on the left for -1. False when no such point
/// exists (the range does not reach the ellipsoid).
bool fqorvZeroDopplerPoint(const CStateVectorOrbit& theOrbit, double theTime, double theRange, double theHeight,
                           int theLookSign, CZeroDopplerPoint& thePoint);

/// The effective (processing) velocity of a fixed target seen at zero Doppler at theTime and
/// slant range theRange: V with R(t)^2 = R0^2 + V^2 (t - t0)^2 near t0, i.e. V^2 = R0 R''(t0), from
/// the satellite's Earth-fixed velocity and acceleration. The target as in fqorvZeroDopplerPoint;
/// NaN when there is none.
double fqorvEffectiveVelocity(const CStateVectorOrbit& theOrbit, double theTime, double theRange, double theHeight,
                              int theLookSign);
