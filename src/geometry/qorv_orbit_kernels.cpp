// Orbit kernels: tension spline, Neville's scheme, least-squares polynomial, central
// differences, Earth model, scene centre estimate, Greenwich angle.
#include <algorithm>
#include <cmath>
#include <string>
#include <vector>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_orbit_utility.h"

namespace {
constexpr double kPi = 3.14159265358979323846;
}

// ------------------------------------------------------------------------------------------------
// Tension spline. On [t0, t1] (h = t1 - t0) the curve is
//   f(t) = ((y0 - z0)(t1 - t) + (y1 - z1)(t - t0)) / h + (z0 sinh(s(t1 - t)) + z1 sinh(s(t - t0))) / sinh(s h)
// with s the scaled tension and z = f'' / s^2 at the knots; continuity of f' at the inner knots and
// the end slopes give a symmetric tridiagonal system for z.

std::vector<double> fqorvTensionSpline(const double* theT, const double* theY, int n, const double* theTi, int m,
                                       double theTension)
{
    std::vector<double> aOut(static_cast<std::size_t>(std::max(m, 0)));
    if (n < 2 || m <= 0) {
        if (n == 1) std::fill(aOut.begin(), aOut.end(), theY[0]);
        return aOut;
    }
    const double aSigma = std::max(std::fabs(theTension), 0.001) * (n - 1) / (theT[n - 1] - theT[0]);
    std::vector<double> z(static_cast<std::size_t>(n), 0.0);
    if (n > 2) {
        // End slopes by the three-point formula.
        const double d1 = theT[1] - theT[0], d2 = theT[2] - theT[1], d12 = theT[2] - theT[0];
        const double aSlope1 = -(d12 + d1) / d12 / d1 * theY[0] + d12 / d1 / d2 * theY[1] - d1 / d12 / d2 * theY[2];
        const double dn = theT[n - 1] - theT[n - 2], dnm = theT[n - 2] - theT[n - 3], dnn = theT[n - 1] - theT[n - 3];
        const double aSlopeN = dn / dnn / dnm * theY[n - 3] - dnn / dn / dnm * theY[n - 2] + (dnn + dn) / dnn / dn * theY[n - 1];
        // Diagonal and off-diagonal terms of an interval: sinh and cosh from one exponential.
        auto terms = [aSigma](double h, double& theDiag, double& theOff) {
            const double s = aSigma * h;
            const double e = std::exp(s);
            const double aSinh = 0.5 * (e - 1.0 / e);
            const double aCosh = 0.5 * (e + 1.0 / e);
            const double aInv = 1.0 / (h * aSinh);
            theDiag = aInv * (s * aCosh - aSinh);
            theOff = aInv * (aSinh - s);
        };
        std::vector<double> aTemp(static_cast<std::size_t>(n));
        double aDiag1, aOff1;
        double h = theT[1] - theT[0];
        double dx1 = (theY[1] - theY[0]) / h;
        terms(h, aDiag1, aOff1);
        z[0] = (dx1 - aSlope1) / aDiag1;
        aTemp[0] = aOff1 / aDiag1;
        for (int i = 1; i < n - 1; ++i) {
            h = theT[i + 1] - theT[i];
            const double dx2 = (theY[i + 1] - theY[i]) / h;
            double aDiag2, aOff2;
            terms(h, aDiag2, aOff2);
            const double aDiag = aDiag1 + aDiag2 - aOff1 * aTemp[i - 1];
            z[i] = (dx2 - dx1 - aOff1 * z[i - 1]) / aDiag;
            aTemp[i] = aOff2 / aDiag;
            dx1 = dx2;
            aDiag1 = aDiag2;
            aOff1 = aOff2;
        }
        const double aDiag = aDiag1 - aOff1 * aTemp[n - 2];
        z[n - 1] = (aSlopeN - dx1 - aOff1 * z[n - 2]) / aDiag;
        for (int i = n - 2; i >= 0; --i) z[i] -= aTemp[i] * z[i + 1];
    }
    // Evaluation: each time finds its interval by a forward scan from the previous one.
    int k = 1;
    for (int j = 0; j < m; ++j) {
        const double t = theTi[j];
        while (k < n - 1 && t > theT[k]) ++k;
        const double t0 = theT[k - 1], t1 = theT[k];
        const double d1 = t - t0, d2 = t1 - t, h = t1 - t0;
        const double e1 = std::exp(aSigma * d1), e2 = std::exp(aSigma * d2), es = e1 * e2;
        const double s1 = 0.5 * (e1 - 1.0 / e1), s2 = 0.5 * (e2 - 1.0 / e2), ss = 0.5 * (es - 1.0 / es);
        aOut[j] = (z[k] * s1 + z[k - 1] * s2) / ss + ((theY[k] - z[k]) * d1 + (theY[k - 1] - z[k - 1]) * d2) / h;
    }
    return aOut;
}

// ------------------------------------------------------------------------------------------------
// Neville's scheme from the nearest point, alternating up and down the tableau.

namespace {

double nevilleAt(const double* xa, const double* ya, int n, double x, std::vector<double>& c, std::vector<double>& d)
{
    int ns = 0;
    double aDif = std::fabs(x - xa[0]);
    for (int i = 0; i < n; ++i) {
        const double aDift = std::fabs(x - xa[i]);
        if (aDift < aDif) {
            ns = i;
            aDif = aDift;
        }
        c[i] = ya[i];
        d[i] = ya[i];
    }
    double y = ya[ns--];
    for (int mm = 1; mm < n; ++mm) {
        for (int i = 0; i < n - mm; ++i) {
            const double ho = xa[i] - x;
            const double hp = xa[i + mm] - x;
            const double w = c[i + 1] - d[i];
            double den = ho - hp;
            if (den == 0.0) {
                fdfTrace("Error in routine fqorv_pol_interp\n");
                QORV_FATAL(CQORV_ERR_NUMERIC_INPUT, "YError in routine fqorv_pol_interp!");
            }
            den = w / den;
            d[i] = hp * den;
            c[i] = ho * den;
        }
        y += (2 * (ns + 1) < (n - mm)) ? c[ns + 1] : d[ns--];
    }
    return y;
}

}  // namespace

void fqorv_pol_interp(const double* theT, const double* theY, int n, int theWindow, const double* theTi, int m,
                      double* theOut)
{
    const int aPoints = (theWindow > 0 && theWindow < n) ? theWindow : n;
    std::vector<double> c(static_cast<std::size_t>(aPoints)), d(static_cast<std::size_t>(aPoints));
    std::vector<double> xa(theT, theT + aPoints), ya(theY, theY + aPoints);
    int aStart = 0;
    for (int j = 0; j < m; ++j) {
        if (aPoints < n) {
            int aNext = 0;
            while (aNext < n && theT[aNext] <= theTi[j]) ++aNext;
            int s = std::max(aNext - aPoints / 2, 0);
            if (s + aPoints > n) s = n - aPoints;
            if (s != aStart) {
                aStart = s;
                std::copy(theT + s, theT + s + aPoints, xa.begin());
                std::copy(theY + s, theY + s + aPoints, ya.begin());
            }
        }
        theOut[j] = nevilleAt(xa.data(), ya.data(), aPoints, theTi[j], c, d);
    }
}

// ------------------------------------------------------------------------------------------------
// Least squares: normal equations from power sums, inverted by Gauss-Jordan with partial pivoting.

namespace {

void invertInPlace(std::vector<std::vector<double>>& a)
{
    const int n = static_cast<int>(a.size());
    std::vector<std::vector<double>> inv(n, std::vector<double>(n, 0.0));
    for (int i = 0; i < n; ++i) inv[i][i] = 1.0;
    for (int col = 0; col < n; ++col) {
        int aPivot = col;
        for (int r = col + 1; r < n; ++r)
            if (std::fabs(a[r][col]) > std::fabs(a[aPivot][col])) aPivot = r;
        std::swap(a[col], a[aPivot]);
        std::swap(inv[col], inv[aPivot]);
        const double p = a[col][col];
        for (int k = 0; k < n; ++k) {
            a[col][k] /= p;
            inv[col][k] /= p;
        }
        for (int r = 0; r < n; ++r) {
            if (r == col) continue;
            const double f = a[r][col];
            if (f == 0.0) continue;
            for (int k = 0; k < n; ++k) {
                a[r][k] -= f * a[col][k];
                inv[r][k] -= f * inv[col][k];
            }
        }
    }
    a.swap(inv);
}

}  // namespace

std::vector<double> fqorvLeastSquaresPolynomial(const double* theT, const double* theY, int n, int theDegree,
                                                const double* theTi, int m)
{
    const double t0 = *std::min_element(theT, theT + n);
    const double y0 = *std::min_element(theY, theY + n);
    const int k = theDegree + 1;
    std::vector<double> aPowerSums(static_cast<std::size_t>(2 * k - 1), 0.0), b(static_cast<std::size_t>(k), 0.0);
    for (int i = 0; i < n; ++i) {
        const double u = theT[i] - t0, v = theY[i] - y0;
        double p = 1.0;
        for (int j = 0; j < 2 * k - 1; ++j) {
            aPowerSums[j] += p;
            if (j < k) b[j] += v * p;
            p *= u;
        }
    }
    std::vector<std::vector<double>> a(k, std::vector<double>(k));
    for (int r = 0; r < k; ++r)
        for (int c = 0; c < k; ++c) a[r][c] = aPowerSums[r + c];
    invertInPlace(a);
    std::vector<double> aCoeff(static_cast<std::size_t>(k), 0.0);
    for (int r = 0; r < k; ++r)
        for (int c = 0; c < k; ++c) aCoeff[r] += a[r][c] * b[c];
    std::vector<double> aOut(static_cast<std::size_t>(std::max(m, 0)));
    for (int j = 0; j < m; ++j) {
        const double u = theTi[j] - t0;
        double v = aCoeff[k - 1];
        for (int i = k - 2; i >= 0; --i) v = v * u + aCoeff[i];
        aOut[j] = v + y0;
    }
    return aOut;
}

// ------------------------------------------------------------------------------------------------

std::vector<double> deriv(const std::vector<double>& a)
{
    const std::size_t n = a.size();
    if (n < 3) QORV_FATAL(CQORV_ERR_NUMERIC_INPUT, "Too few points in deriv function.");
    // Central differences through the array shifted one place each way (cyclic), then the ends.
    std::vector<double> d(n);
    for (std::size_t i = 0; i < n; ++i) d[i] = (a[(i + 1) % n] - a[(i + n - 1) % n]) / 2.0;
    d[0] = (4.0 * a[1] - 3.0 * a[0] - a[2]) / 2.0;
    d[n - 1] = (3.0 * a[n - 1] - 4.0 * a[n - 2] + a[n - 3]) / 2.0;
    return d;
}

// ------------------------------------------------------------------------------------------------
// Earth model.

void fqorvCartesianToGeodetic(double theX, double theY, double theZ, double& theLat, double& theLon, double& theH,
                              double theA, double theB)
{
    const double e2 = (theA * theA - theB * theB) / (theA * theA);
    const double ep2 = (theA * theA - theB * theB) / (theB * theB);
    const double p = std::hypot(theX, theY);
    theLon = std::atan2(theY, theX);
    // Bowring's closed form as the start, then Newton-like refinements of the latitude.
    const double u = std::atan2(theZ * theA, p * theB);
    const double su = std::sin(u), cu = std::cos(u);
    double phi = std::atan2(theZ + ep2 * theB * su * su * su, p - e2 * theA * cu * cu * cu);
    for (int i = 0; i < 2; ++i) {
        const double s = std::sin(phi);
        const double aN = theA / std::sqrt(1.0 - e2 * s * s);
        const double h = p * std::cos(phi) + theZ * s - theA * theA / aN;
        phi = std::atan2(theZ, p * (1.0 - e2 * aN / (aN + h)));
    }
    const double s = std::sin(phi);
    theLat = phi;
    theH = p * std::cos(phi) + theZ * s - theA * std::sqrt(1.0 - e2 * s * s);
}

const char* fqorvOrbitConfiguration(double theHeadingDeg)
{
    const double h = theHeadingDeg < 0.0 ? theHeadingDeg + 180.0 : theHeadingDeg;
    return (h > 270.0 || h < 90.0) ? "ASCENDING" : "DESCENDING";
}

void fqorvEstimateSceneCentre(double theX, double theY, double theZ, double theMidRange, double theAlongTrack,
                              double theHeadingDeg, double theLookSign, double& theLat, double& theLon)
{
    const double a = CQORV_WGS84_A, b = CQORV_WGS84_B;
    double aLat, aLon, h;
    fqorvCartesianToGeodetic(theX, theY, theZ, aLat, aLon, h, a, b);
    auto localRadius = [a, b](double theTheta) {
        const double c = std::cos(theTheta), s = std::sin(theTheta);
        return a * b / std::sqrt(b * b * c * c + a * a * s * s);
    };
    double theta = std::atan(std::tan(aLat) * b * b / (a * a));  // geocentric latitude
    double rc = localRadius(theta);
    const double d = std::sqrt(theMidRange * theMidRange - h * h);  // ground distance to mid swath
    const double aH = theHeadingDeg * kPi / 180.0;
    // Across track.
    theta -= theLookSign * d * std::sin(aH) / rc;
    aLon += theLookSign * (d * std::cos(aH) / std::cos(theta)) / rc;
    // Along track, with the angle pi/2 - heading.
    rc = localRadius(theta);
    const double aA = kPi / 2.0 - aH;
    theta -= theLookSign * theAlongTrack * std::sin(aA) / rc;
    aLon += theLookSign * (theAlongTrack * std::cos(aA) / std::cos(theta)) / rc;
    theLat = std::atan(std::tan(theta) * a * a / (b * b));
    theLon = aLon;
}

int fqorvUtmZone(double theLonDeg)
{
    double l = theLonDeg;
    if (l > 180.0) l -= 360.0;
    if (l < -180.0) l += 360.0;
    return 1 + static_cast<int>((l + 180.0) / 6.0);
}

double fqorvGreenwichAngle(long theDays, double theSeconds)
{
    double d = static_cast<double>(theDays);
    double s = theSeconds;
    const double aWhole = std::floor(s / 86400.0);
    d += aWhole;
    s -= aWhole * 86400.0;
    double aDeg = s * (360.9856473353867 / 86400.0) + (d * 2.9015096752e-13 + 360.9856473353867) * d +
                  100.02148297988751;
    aDeg -= std::trunc(aDeg / 360.0) * 360.0;
    return aDeg / 57.29577951308232;
}

void fqorvRotateInertialToEarthFixed(double theTheta, double& theX, double& theY)
{
    const double c = std::cos(theTheta), s = std::sin(theTheta);
    const double x = theX * c + theY * s;
    const double y = theY * c - theX * s;
    theX = x;
    theY = y;
}
