// Vectors, the Earth ellipsoid and UTC dates of the raw-data simulator.
//
// Positions are Earth-centred Earth-fixed (ECEF) in metres; angles in radians unless a name says
// degrees. Dates are kept as a day number (days since 1 January 1970) and seconds of that day.
#pragma once

#include <cmath>
#include <string>

/// A 3-vector of doubles (positions in m, velocities in m/s).
struct CSimVec3 {
    double x = 0.0, y = 0.0, z = 0.0;

    CSimVec3() = default;
    constexpr CSimVec3(double a, double b, double c) : x(a), y(b), z(c) {}
    CSimVec3 operator+(const CSimVec3& o) const { return {x + o.x, y + o.y, z + o.z}; }
    CSimVec3 operator-(const CSimVec3& o) const { return {x - o.x, y - o.y, z - o.z}; }
    CSimVec3 operator*(double s) const { return {x * s, y * s, z * s}; }
    CSimVec3 operator/(double s) const { return {x / s, y / s, z / s}; }
    CSimVec3& operator+=(const CSimVec3& o) { x += o.x; y += o.y; z += o.z; return *this; }
    CSimVec3& operator-=(const CSimVec3& o) { x -= o.x; y -= o.y; z -= o.z; return *this; }
    double dot(const CSimVec3& o) const { return x * o.x + y * o.y + z * o.z; }
    CSimVec3 cross(const CSimVec3& o) const { return {y * o.z - z * o.y, z * o.x - x * o.z, x * o.y - y * o.x}; }
    double norm() const { return std::sqrt(x * x + y * y + z * z); }
    CSimVec3 unit() const { return *this / norm(); }
};

inline CSimVec3 operator*(double s, const CSimVec3& v) { return v * s; }

inline constexpr double CQORV_SIM_PI = 3.14159265358979323846;
inline constexpr double CQORV_SIM_DEG = CQORV_SIM_PI / 180.0;

/// An ellipsoid of revolution by its semi-axes (m).
struct CSimEllipsoid {
    double mA = 6378137.0;
    double mB = 6356752.314245179;

    double e2() const { return (mA * mA - mB * mB) / (mA * mA); }
    /// Radius of curvature in the prime vertical at geodetic latitude theLat (rad), m.
    double primeVertical(double theLat) const
    {
        const double s = std::sin(theLat);
        return mA / std::sqrt(1.0 - e2() * s * s);
    }
};

/// WGS-84, the ellipsoid on which targets given by latitude, longitude and height are placed.
inline constexpr CSimEllipsoid CQORV_SIM_WGS84{6378137.0, 6356752.314245179};

/// ECEF position (m) of geodetic latitude and longitude (rad) and ellipsoidal height (m).
CSimVec3 fqorvSimGeodeticToEcef(const CSimEllipsoid& theEllipsoid, double theLat, double theLon, double theHeight);
/// Geodetic latitude, longitude (rad) and height (m) of an ECEF position; exact to well below a
/// millimetre for points near the surface and at orbit height.
void fqorvSimEcefToGeodetic(const CSimEllipsoid& theEllipsoid, const CSimVec3& thePos, double& theLat,
                            double& theLon, double& theHeight);
/// Outward unit normal of the ellipsoid at geodetic latitude and longitude (rad).
CSimVec3 fqorvSimEllipsoidNormal(double theLat, double theLon);

/// A UTC instant: whole days since 1970-01-01 and seconds of the day (0 <= seconds < 86400).
struct CSimUtc {
    long mDay = 0;
    double mSeconds = 0.0;

    /// This instant moved by theSeconds (any sign), normalised.
    CSimUtc plus(double theSeconds) const;
    /// Seconds from theOther to this instant.
    double minus(const CSimUtc& theOther) const
    {
        return static_cast<double>(mDay - theOther.mDay) * 86400.0 + (mSeconds - theOther.mSeconds);
    }
};

/// Parses "YYYY-MM-DDThh:mm:ss[.f...]" (a blank may stand for the 'T'); false on a bad text.
bool fqorvSimParseIsoDate(const std::string& theText, CSimUtc& theUtc);
/// "YYYY-MM-DDThh:mm:ss.uuuuuu".
std::string fqorvSimIsoDate(const CSimUtc& theUtc);
/// The header date text "DD-MMM-YYYY hh:mm:ss.uuuuuu" (months "JAN" .. "DEC"), rounded to the
/// microsecond with the carry into seconds, minutes, hours and the date.
std::string fqorvSimHeaderDate(const CSimUtc& theUtc);
/// Civil date of a day number since 1970-01-01.
void fqorvSimCivilFromDays(long theDays, int& theYear, int& theMonth, int& theDay);
/// Day number since 1970-01-01 of a civil date.
long fqorvSimDaysFromCivil(int theYear, int theMonth, int theDay);
/// Greenwich mean sidereal angle (rad, 0 .. 2 pi) at a UTC instant (UT1 taken as UTC).
double fqorvSimGreenwichAngle(const CSimUtc& theUtc);
