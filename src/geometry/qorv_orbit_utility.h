// The orbit of an image: one Earth-fixed position and velocity per image line, interpolated from
// the state vectors of a header, with the kernels it is built from (tension spline, Neville's
// scheme, least-squares polynomial, central differences, Earth model and frame rotation).
#pragma once

#include <vector>

class CDescriptionHeader;

/// WGS-84 ellipsoid axes (m) of the geodetic conversions.
inline constexpr double CQORV_WGS84_A = 6378137.0;
inline constexpr double CQORV_WGS84_B = 6356752.314245179;
/// Ellipsoid of the mean altitude (m).
inline constexpr double CQORV_ALT_EARTH_A = 6378144.0;
inline constexpr double CQORV_ALT_EARTH_B = 6356755.0;

/// The orbit table of an image: one row per line (times line factor, plus pad lines at both ends).
class YDF_ORBIT {
public:
    YDF_ORBIT() = default;

    /// Builds the table from a header: aStore when non-null (the store is used and changed in
    /// place: heading, orbit configuration, scene centre, "ECR" rotation), otherwise the file
    /// aParamFile ("_hdr" appended unless it ends in "_orb_hdr" or "_orb.sml"), which is saved
    /// again. aAzimuthPixelsShift shifts all rows by that many lines (the header's
    /// "OrbitCorrection.AzimuthPixelShift" instead when aUseHdrShift). The chain passes
    /// (nullptr, 0, false, &header, 0, 1).
    void orbit(const char* aParamFile, float aAzimuthPixelsShift, bool aUseHdrShift, CDescriptionHeader* aStore,
               int aPadLines, int aLineFactor);

    /// Height (m) of the middle row above the ellipsoid (a 6378144.0, b 6356755.0) at the store's
    /// "LatNorthing"/"LonEasting": |r| minus the ellipsoid radius there. Builds the orbit first
    /// when the table is empty.
    double meanAltitude(CDescriptionHeader& theStore);

    bool empty() const { return mNrOfLines == 0; }

    int mPadLines = 0;
    int mNrOfLines = 0;          // rows: lines * line factor + 2 * pad lines
    double mAzimuthShift = 0.0;  // lines, as used
    std::vector<double> x, y, z;     // m, Earth-fixed
    std::vector<double> vx, vy, vz;  // m/s, Earth-fixed
    std::vector<double> ti;          // s since the reference day (the day before the earlier of
                                     // "TimeFirst" and "AzimuthStartTime")
    // The state vectors the table was interpolated from (times in the frame of ti).
    std::vector<double> mStateVectorTime, mStateVectorX, mStateVectorY, mStateVectorZ;
    int mStateVectorNbr = 0;
    int mWindow = 0;             // points per local Neville polynomial: 0 all, else 9
    double mHeading = 0.0;       // scene heading, degrees
    double mLineFactor = 1.0;
    double mInvLineFactor = 1.0;
    // Set by orbit(): the time base of ti and the line time.
    long mReferenceDay = 0;      // day number (days since 1970-01-01) of ti = 0
    double mLineTime = 0.0;      // dt = "Processing.NAzimuthLooks" / "PRF", s
    int mSensorId = -1;
    bool mPolynomial = false;    // interpolator chosen: polynomial (else tension spline)
    bool mNewMethod = false;     // Neville (else least squares)
    int mDegree = 4;
};

// --- kernels: values in, values out; no store, no files ---

/// Tension spline (tension theTension, below 0.001 taken as 0.001) through (theT[i], theY[i]),
/// theT increasing, n >= 2, evaluated at the increasing times theTi[0..m-1]. End slopes by the
/// three-point formula; two points give zero end curvature (a straight line). Outside the knots
/// the end interval's curve is used.
std::vector<double> fqorvTensionSpline(const double* theT, const double* theY, int n, const double* theTi, int m,
                                       double theTension = 1.0);

/// Neville's polynomial interpolation of (theT, theY), n points, at theTi[0..m-1] into theOut:
/// through all n points when theWindow is 0, else through theWindow consecutive points around
/// each time. Two equal times fail with 456960 ("YError in routine fqorv_pol_interp!").
void fqorv_pol_interp(const double* theT, const double* theY, int n, int theWindow, const double* theTi, int m,
                      double* theOut);

/// Least-squares polynomial of theDegree through (theT, theY), n points, evaluated at theTi:
/// minima of t and y taken off, normal equations inverted, Horner's rule, offsets put back.
std::vector<double> fqorvLeastSquaresPolynomial(const double* theT, const double* theY, int n, int theDegree,
                                                const double* theTi, int m);

/// Derivative per sample: central differences inside, three-point one-sided formulas at the
/// ends. Fewer than three points fail with 456960 ("Too few points in deriv function.").
std::vector<double> deriv(const std::vector<double>& a);

/// Earth-fixed Cartesian (m) to geodetic latitude, longitude (radians) and height (m) on the
/// ellipsoid of axes theA, theB (WGS-84 by default); Bowring's start and two Newton refinements.
void fqorvCartesianToGeodetic(double theX, double theY, double theZ, double& theLat, double& theLon, double& theH,
                              double theA = CQORV_WGS84_A, double theB = CQORV_WGS84_B);

/// Scene heading (degrees; negative ones count +180) as "ASCENDING" (above 270 or below 90) or
/// "DESCENDING".
const char* fqorvOrbitConfiguration(double theHeadingDeg);

/// Scene centre estimate (radians) from the middle row's position: across track by the ground
/// distance of the mid-swath slant range, along track by theAlongTrack metres, on the side of
/// theLookSign (+1 right). theHeadingDeg in degrees.
void fqorvEstimateSceneCentre(double theX, double theY, double theZ, double theMidRange, double theAlongTrack,
                              double theHeadingDeg, double theLookSign, double& theLat, double& theLon);

/// UTM zone (1 .. 60) of a longitude in degrees (brought into -180 .. 180 first).
int fqorvUtmZone(double theLonDeg);

/// Greenwich angle (radians, 0 .. 2 pi) for theDays days since 1 January 1975 and theSeconds of
/// that day (seconds beyond a day are folded into the days).
double fqorvGreenwichAngle(long theDays, double theSeconds);
/// Rotates an inertial position about z into the Earth-fixed frame by the Greenwich angle.
void fqorvRotateInertialToEarthFixed(double theTheta, double& theX, double& theY);

/// The store operation: when "StateVectorReference" begins with "IRS", rotates every "pos_x",
/// "pos_y" to Earth-fixed, sets the reference to "ECR", and writes "MeanAltitude" when the store
/// holds none (building the orbit for it).
void fqorvConvertStateVectorsToEcr(CDescriptionHeader& theStore);
