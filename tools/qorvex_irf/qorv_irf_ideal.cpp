#include "qorv_irf_ideal.h"

#include <algorithm>
#include <cmath>

namespace {

const double CQORV_IRF_PI = std::acos(-1.0);
/// Kaiser beta of the focuser's range and azimuth weighting.
constexpr double CQORV_IRF_KAISER_BETA = 2.12;

// The analyser's window is its own code, independent of the focuser's I0 and Kaiser, so that an
// error in the focuser's window cannot cancel out of the comparison with the ideal response.

/// I0 by its power series, the sum of (x/2)^(2k) / (k!)^2, in long double.
double seriesI0(double x)
{
    const long double q = static_cast<long double>(x) * x / 4.0L;
    long double aSum = 1.0L, aTerm = 1.0L;
    for (int k = 1; k < 5000 && aTerm > aSum * 1e-22L; ++k) {
        aTerm *= q / (static_cast<long double>(k) * k);
        aSum += aTerm;
    }
    return static_cast<double>(aSum);
}

/// Kaiser weight at x in [-1, 1]: I0(beta sqrt(1 - x^2)) / I0(beta), given I0(beta).
double kaiserAt(double x, double theBeta, double theI0Beta)
{
    const double r = 1.0 - x * x;
    return seriesI0(theBeta * std::sqrt(r > 0.0 ? r : 0.0)) / theI0Beta;
}

/// sin(pi x) / (pi x).
double normalisedSinc(double x)
{
    return std::fabs(x) < 1e-12 ? 1.0 : std::sin(CQORV_IRF_PI * x) / (CQORV_IRF_PI * x);
}

/// Smallest power of two not below n.
int powerOfTwoAbove(int n)
{
    int m = 1;
    while (m < n) m *= 2;
    return m;
}

}  // namespace

CIrfCut fqorvIrfMeasureSpectrum(const std::vector<fcomplex>& theSpectrum, double theCentre, int theUpsample,
                                double theSidelobeWidths)
{
    const int n = static_cast<int>(theSpectrum.size());
    const int m = n * theUpsample;
    std::vector<fcomplex> aPadded(m);
    for (int k = 0; k < n; ++k) aPadded[fqorvIrfPaddedBin(k, n, theUpsample, theCentre)] = theSpectrum[k];
    FftPlan1D(m, FftDirection::Inverse).execute(aPadded.data());

    // The cut is the periodic response rotated so that its peak sits in the middle.
    int aPeak = 0;
    for (int i = 1; i < m; ++i)
        if (std::norm(aPadded[i]) > std::norm(aPadded[aPeak])) aPeak = i;
    std::vector<double> aPower(m);
    for (int i = 0; i < m; ++i) aPower[i] = std::norm(aPadded[((aPeak - m / 2 + i) % m + m) % m]);
    return fqorvIrfMeasureCut(aPower, theUpsample, theSidelobeWidths);
}

std::vector<fcomplex> fqorvIrfKaiserBand(int n, double theRate, double theWidth, double theCentre, double theBeta,
                                         const std::function<double(double)>& theShape)
{
    std::vector<fcomplex> aSpectrum(n);
    const double aI0Beta = seriesI0(theBeta);
    for (int k = 0; k < n; ++k) {
        // Frequency of bin k taken within half the rate of the centre.
        double f = k * theRate / n;
        f -= theRate * std::floor((f - theCentre) / theRate + 0.5);
        const double x = 2.0 * (f - theCentre) / theWidth;
        if (std::fabs(x) > 1.0) continue;
        double w = kaiserAt(x, theBeta, aI0Beta);
        if (theShape) w *= theShape(f - theCentre);
        aSpectrum[k] = fcomplex(static_cast<float>(w), 0.0f);
    }
    return aSpectrum;
}

CIrfCut fqorvIrfIdealRangeBand(double theBandwidth, double theSamplingRate, int theUpsample, double theSidelobeWidths)
{
    const std::vector<fcomplex> aSpectrum = fqorvIrfKaiserBand(CQORV_IRF_IDEAL_BINS, theSamplingRate, theBandwidth, 0.0,
                                                               CQORV_IRF_KAISER_BETA);
    return fqorvIrfMeasureSpectrum(aSpectrum, 0.0, theUpsample, theSidelobeWidths);
}

CIrfCut fqorvIrfIdealRangeChirp(double theBandwidth, double thePulseLength, double theSamplingRate, int theUpsample,
                                double theSidelobeWidths)
{
    // The replica as range compression makes it: M = trunc(T fs) + 1 samples of the chirp
    // exp(j 2 pi (k t / 2 + fstart) t), fstart = -k T / 2, weighted by Kaiser 2.12 over the M samples.
    const int M = static_cast<int>(thePulseLength * theSamplingRate) + 1;
    const double k = theBandwidth / thePulseLength;
    const double aStart = -0.5 * k * thePulseLength;
    const int n = std::max(powerOfTwoAbove(2 * M), CQORV_IRF_IDEAL_BINS);
    std::vector<fcomplex> aEcho(n);
    std::vector<fcomplex> aReplica(n);
    const double aI0Beta = seriesI0(CQORV_IRF_KAISER_BETA);
    for (int i = 0; i < M; ++i) {
        const double t = i / theSamplingRate;
        const double aPhase = 2.0 * CQORV_IRF_PI * (0.5 * k * t + aStart) * t;
        aEcho[i] = fcomplex(static_cast<float>(std::cos(aPhase)), static_cast<float>(std::sin(aPhase)));
        const double aWeight = M > 1 ? kaiserAt(2.0 * (i - (M - 1) / 2.0) / (M - 1), CQORV_IRF_KAISER_BETA, aI0Beta) : 1.0;
        aReplica[i] = aEcho[i] * static_cast<float>(aWeight);
    }
    FftPlan1D aForward(n, FftDirection::Forward);
    aForward.execute(aEcho.data());
    aForward.execute(aReplica.data());
    // The compressed spectrum: echo times the conjugate replica, centred on 0.
    for (int i = 0; i < n; ++i) aEcho[i] *= std::conj(aReplica[i]);
    return fqorvIrfMeasureSpectrum(aEcho, 0.0, theUpsample, theSidelobeWidths);
}

CIrfCut fqorvIrfIdealAzimuth(double thePrf, double theFraction, double theCentroid, double theAntennaLength,
                             double theVelocity, int theUpsample, double theSidelobeWidths)
{
    // Two-way amplitude pattern against Doppler: L sin(psi) / lambda = L (f - fdc) / (2 V).
    std::function<double(double)> aPattern;
    if (theAntennaLength > 0.0 && theVelocity > 0.0) {
        aPattern = [theAntennaLength, theVelocity](double df) {
            const double s = normalisedSinc(theAntennaLength * df / (2.0 * theVelocity));
            return s * s;
        };
    }
    const int n = CQORV_IRF_IDEAL_BINS;
    const std::vector<fcomplex> aSpectrum = fqorvIrfKaiserBand(n, thePrf, theFraction * thePrf, theCentroid,
                                                               CQORV_IRF_KAISER_BETA, aPattern);
    return fqorvIrfMeasureSpectrum(aSpectrum, theCentroid / thePrf * n, theUpsample, theSidelobeWidths);
}
