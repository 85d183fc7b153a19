// Synthetic point responses for the point-target analysis tests: continuous band-limited
// responses sampled on an image grid, with the ERS-like scene's parameters.
#pragma once

#include <cmath>
#include <functional>
#include <limits>
#include <vector>

#include "qorv_irf_measure.h"

namespace irftest {

inline const double kPi = std::acos(-1.0);
inline const double kNaN = std::numeric_limits<double>::quiet_NaN();

// The ERS-like scene of the independent simulator (chirp, sampling, PRF, antenna, Doppler) and
// the ideal figures that its own program computed for the chain's weighting.
inline const double kBandwidth = 15.55e6;
inline const double kPulse = 37.12e-6;
inline const double kFs = 18.96e6;
inline const double kPrf = 1679.9023936391638;
inline const double kCentroid = 310.0;
inline const double kAntenna = 10.0;
inline const double kPlatformSpeed = 7554.45;
inline const double kEffectiveVelocity = 7109.517279697725;
struct Figures {
    double mIrw, mPslr, mIslr;
};
inline const Figures kTheoryRangeKaiser{1.2242245333706614, -19.010636796153978, -16.762371185304023};
inline const Figures kTheoryRangeChain{1.226367770320259, -18.970863484630797, -16.680721198893973};
inline const Figures kTheoryAzimuthKaiser{1.2550547463200312, -19.011320372790195, -16.76237291436648};
inline const Figures kTheoryAzimuthCentre{1.3853841790196144, -25.84059624835628, -23.360023152434465};

using Weight = std::function<double(double)>;

/// Spectral weight of a band theWidth cycles per sample wide, [-w/2, w/2), optionally Kaiser (with
/// the standard library's I0: the tests' window stays apart from the focuser's).
inline Weight band(double theWidth, double theBeta = 0.0, Weight theShape = {})
{
    const double aI0Beta = std::cyl_bessel_i(0.0, theBeta);
    return [=](double f) {
        const double x = 2.0 * f / theWidth;
        if (x < -1.0 || x >= 1.0) return 0.0;
        double w = theBeta > 0.0 ? std::cyl_bessel_i(0.0, theBeta * std::sqrt(1.0 - x * x)) / aI0Beta : 1.0;
        if (theShape) w *= theShape(f);
        return w;
    };
}

/// Two-way antenna pattern against azimuth frequency in cycles per line.
inline Weight antenna(double theSpeed)
{
    return [=](double f) {
        const double x = kAntenna * f * kPrf / (2.0 * theSpeed);
        const double s = x == 0.0 ? 1.0 : std::sin(kPi * x) / (kPi * x);
        return s * s;
    };
}

/// The chain's weights in the ERS-like scene: azimuth Kaiser over 0.8 of the PRF times the
/// antenna pattern, range Kaiser over the chirp's band.
inline Weight ersAzimuth() { return band(0.8, 2.12, antenna(kPlatformSpeed)); }
inline Weight ersRange() { return band(kBandwidth / kFs, 2.12); }

/// Samples 0 .. n-1 of the continuous response of a band: s(x) = integral of W(f - c)
/// exp(j 2 pi f (x - x0)) df over c +- 1/2 cycle per sample (midpoint rule, 8192 steps), so that
/// the band's edges are not tied to any transform grid.
inline std::vector<dcomplex> response(int n, double x0, const Weight& theWeight, double c)
{
    const int m = 8192;
    std::vector<dcomplex> s(n);
    for (int j = 0; j < m; ++j) {
        const double df = (j + 0.5) / m - 0.5;
        const double w = theWeight(df);
        if (w == 0.0) continue;
        for (int x = 0; x < n; ++x) s[x] += w * std::polar(1.0 / m, 2.0 * kPi * (c + df) * (x - x0));
    }
    return s;
}

/// Adds one point response of complex amplitude theAmp at (theLine, thePixel) to an image, with
/// the spectrum Wa(fa - ca) Wr(fr - cr): centres in cycles per sample, bands that may wrap.
inline void addPointTarget(CIrfChip& theImage, double theLine, double thePixel, const Weight& theAz, double ca,
                           const Weight& theRg, double cr, fcomplex theAmp = 1.0f)
{
    const std::vector<dcomplex> a = response(theImage.mLines, theLine, theAz, ca);
    const std::vector<dcomplex> r = response(theImage.mPixels, thePixel, theRg, cr);
    for (int l = 0; l < theImage.mLines; ++l)
        for (int p = 0; p < theImage.mPixels; ++p) theImage.at(l, p) += theAmp * fcomplex(a[l] * r[p]);
}

/// An image of nl x np samples holding one such point response.
inline CIrfChip pointTarget(int nl, int np, double theLine, double thePixel, const Weight& theAz, double ca,
                            const Weight& theRg, double cr, fcomplex theAmp = 1.0f)
{
    CIrfChip aImage(nl, np, 0, 0);
    addPointTarget(aImage, theLine, thePixel, theAz, ca, theRg, cr, theAmp);
    return aImage;
}

}  // namespace irftest
