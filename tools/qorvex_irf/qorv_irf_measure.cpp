#include "qorv_irf_measure.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

const double CQORV_IRF_TWO_PI = 2.0 * std::acos(-1.0);

/// Offset of the vertex of the parabola through (-1, a), (0, b), (1, c), in [-0.5, 0.5].
double parabolaVertex(double a, double b, double c)
{
    const double aDen = a - 2.0 * b + c;
    if (aDen >= 0.0) return 0.0;  // not a maximum: keep the sample
    return std::clamp(0.5 * (a - c) / aDen, -0.5, 0.5);
}

/// Value of that parabola at its vertex.
double parabolaTop(double a, double b, double c, double theVertex)
{
    return b - 0.25 * (a - c) * theVertex;
}

/// The signed centre in cycles per sample, in [-0.5, 0.5), of a centre given in bins of n.
double signedCycles(double theCentreBins, int n)
{
    double aCycles = theCentreBins / n;
    aCycles -= std::floor(aCycles + 0.5);
    return aCycles;
}

/// Crossing of the threshold between samples i and i + 1 (linear in power), in samples of the cut.
double crossing(const std::vector<double>& p, int i, double theLevel)
{
    const double aStep = p[i + 1] - p[i];
    return aStep != 0.0 ? i + (theLevel - p[i]) / aStep : i + 0.5;
}

/// Sum of p over [i0, i1] (empty when i1 < i0).
double sumRange(const std::vector<double>& p, int i0, int i1)
{
    double aSum = 0.0;
    for (int i = i0; i <= i1; ++i) aSum += p[i];
    return aSum;
}

double toDb(double theRatio)
{
    return theRatio > 0.0 ? 10.0 * std::log10(theRatio) : -std::numeric_limits<double>::infinity();
}

/// Cut of powers through sample `theAt` of a periodic grid along one axis, rotated so that the
/// sample sits at index n/2 (n the grid's length along the axis).
std::vector<double> periodicCut(const CIrfChip& theGrid, int theLine, int thePixel, bool theAlongRange)
{
    const int n = theAlongRange ? theGrid.mPixels : theGrid.mLines;
    const int aAt = theAlongRange ? thePixel : theLine;
    std::vector<double> aCut(n);
    for (int i = 0; i < n; ++i) {
        const int j = ((aAt - n / 2 + i) % n + n) % n;
        aCut[i] = std::norm(theAlongRange ? theGrid.at(theLine, j) : theGrid.at(j, thePixel));
    }
    return aCut;
}

}  // namespace

CIrfCut fqorvIrfMeasureCut(const std::vector<double>& thePower, int theUpsample, double theSidelobeWidths)
{
    CIrfCut aCut;
    const std::vector<double>& p = thePower;
    const int n = static_cast<int>(p.size());
    if (n < 3 || theUpsample < 1) return aCut;
    const double u = theUpsample;

    const int ip = static_cast<int>(std::max_element(p.begin(), p.end()) - p.begin());
    if (!(p[ip] > 0.0)) return aCut;
    double aVertex = 0.0;
    double aPeak = p[ip];
    if (ip > 0 && ip < n - 1) {
        aVertex = parabolaVertex(p[ip - 1], p[ip], p[ip + 1]);
        aPeak = parabolaTop(p[ip - 1], p[ip], p[ip + 1], aVertex);
    }
    aCut.mPeak = (ip + aVertex) / u;
    aCut.mPeakPower = aPeak;

    // Width at half power, each side interpolated linearly in power between the upsampled samples.
    const double aLevel = CQORV_IRF_WIDTH_POWER * aPeak;
    int iL = ip;
    while (iL > 0 && p[iL] > aLevel) --iL;
    int iR = ip;
    while (iR < n - 1 && p[iR] > aLevel) ++iR;
    if (p[iL] > aLevel || p[iR] > aLevel) return aCut;
    const double xL = crossing(p, iL, aLevel);
    const double xR = crossing(p, iR - 1, aLevel);
    aCut.mIrw = (xR - xL) / u;

    // First minima: the main lobe falls monotonically down to them.
    int iMinL = ip;
    while (iMinL > 0 && p[iMinL - 1] < p[iMinL]) --iMinL;
    int iMinR = ip;
    while (iMinR < n - 1 && p[iMinR + 1] < p[iMinR]) ++iMinR;
    aCut.mMinimumLeft = (iMinL - ip) / u;
    aCut.mMinimumRight = (iMinR - ip) / u;

    // Sidelobe region: beyond the minima, within the given number of widths of the peak.
    const double aExtent = theSidelobeWidths * aCut.mIrw * u;
    int iLo = static_cast<int>(std::ceil(ip - aExtent));
    int iHi = static_cast<int>(std::floor(ip + aExtent));
    if (iLo < 0 || iHi > n - 1) aCut.mClipped = true;
    iLo = std::max(iLo, 0);
    iHi = std::min(iHi, n - 1);
    aCut.mSidelobeExtent = std::min(ip - iLo, iHi - ip) / u;

    // The highest sidelobe sample, refined like the peak so that the grid's phase does not matter.
    int iSide = -1;
    for (int i = iLo; i <= iHi; ++i)
        if ((i < iMinL || i > iMinR) && (iSide < 0 || p[i] > p[iSide])) iSide = i;
    double aSideMax = iSide >= 0 ? p[iSide] : 0.0;
    if (iSide > 0 && iSide < n - 1 && p[iSide - 1] <= p[iSide] && p[iSide + 1] <= p[iSide])
        aSideMax = parabolaTop(p[iSide - 1], p[iSide], p[iSide + 1],
                               parabolaVertex(p[iSide - 1], p[iSide], p[iSide + 1]));
    const double aMain = sumRange(p, iMinL, iMinR);
    const double aSide = sumRange(p, iLo, iMinL - 1) + sumRange(p, iMinR + 1, iHi);
    aCut.mPslrDb = toDb(aSideMax / aPeak);
    aCut.mIslrDb = toDb(aSide / aMain);
    aCut.mValid = true;
    return aCut;
}

double fqorvIrfSpectrumCentre(const std::vector<double>& theEnergy)
{
    const int n = static_cast<int>(theEnergy.size());
    double aRe = 0.0;
    double aIm = 0.0;
    for (int k = 0; k < n; ++k) {
        const double aAngle = CQORV_IRF_TWO_PI * k / n;
        aRe += theEnergy[k] * std::cos(aAngle);
        aIm += theEnergy[k] * std::sin(aAngle);
    }
    if (aRe == 0.0 && aIm == 0.0) return 0.0;
    double aCentre = std::atan2(aIm, aRe) / CQORV_IRF_TWO_PI * n;
    if (aCentre < 0.0) aCentre += n;
    return aCentre >= n ? 0.0 : aCentre;
}

int fqorvIrfPaddedBin(int k, int n, int theFactor, double theCentre)
{
    // The frequency k + m n that lies in [centre - n/2, centre + n/2).
    const long aShifted = k - static_cast<long>(n) * static_cast<long>(std::floor((k - theCentre + 0.5 * n) / n));
    const long aSize = static_cast<long>(n) * theFactor;
    return static_cast<int>(((aShifted % aSize) + aSize) % aSize);
}

std::vector<fcomplex> fqorvIrfUpsample1D(const std::vector<fcomplex>& theSignal, int theFactor, double theCentre)
{
    const int n = static_cast<int>(theSignal.size());
    std::vector<fcomplex> aSpectrum(theSignal);
    FftPlan1D(n, FftDirection::Forward).execute(aSpectrum.data());
    if (std::isnan(theCentre)) {
        std::vector<double> aEnergy(n);
        for (int k = 0; k < n; ++k) aEnergy[k] = std::norm(aSpectrum[k]);
        theCentre = fqorvIrfSpectrumCentre(aEnergy);
    }
    // The inverse is unscaled: 1/n makes sample m * factor equal to input sample m.
    const float aScale = 1.0f / n;
    std::vector<fcomplex> aPadded(static_cast<std::size_t>(n) * theFactor);
    for (int k = 0; k < n; ++k) aPadded[fqorvIrfPaddedBin(k, n, theFactor, theCentre)] = aSpectrum[k] * aScale;
    FftPlan1D(n * theFactor, FftDirection::Inverse).execute(aPadded.data());
    return aPadded;
}

CIrfUpsampled fqorvIrfUpsampleChip(const CIrfChip& theChip, int theFactor, double theAzimuthCentre,
                                   double theRangeCentre)
{
    const int nl = theChip.mLines;
    const int np = theChip.mPixels;
    std::vector<fcomplex> aSpectrum(theChip.mData);
    FftPlan2D(nl, np, FftDirection::Forward, false).execute(aSpectrum.data());

    // Centres in bins: given ones are converted, missing ones estimated from the energy spectrum.
    double aAzBins = theAzimuthCentre * nl;
    double aRgBins = theRangeCentre * np;
    if (std::isnan(theAzimuthCentre) || std::isnan(theRangeCentre)) {
        std::vector<double> aAzEnergy(nl, 0.0);
        std::vector<double> aRgEnergy(np, 0.0);
        for (int a = 0; a < nl; ++a)
            for (int r = 0; r < np; ++r) {
                const double e = std::norm(aSpectrum[static_cast<std::size_t>(a) * np + r]);
                aAzEnergy[a] += e;
                aRgEnergy[r] += e;
            }
        if (std::isnan(theAzimuthCentre)) aAzBins = fqorvIrfSpectrumCentre(aAzEnergy);
        if (std::isnan(theRangeCentre)) aRgBins = fqorvIrfSpectrumCentre(aRgEnergy);
    }

    // The band is taken around the baseband alias of its centre: any alias gives the same samples
    // and magnitudes, but the phase between samples follows the carrier chosen.
    CIrfUpsampled aOut;
    aOut.mFactor = theFactor;
    aOut.mAzimuthCentre = signedCycles(aAzBins, nl);
    aOut.mRangeCentre = signedCycles(aRgBins, np);
    aAzBins = aOut.mAzimuthCentre * nl;
    aRgBins = aOut.mRangeCentre * np;
    aOut.mGrid = CIrfChip(nl * theFactor, np * theFactor, theChip.mLine0, theChip.mPixel0);

    std::vector<int> aRgBin(np);
    for (int r = 0; r < np; ++r) aRgBin[r] = fqorvIrfPaddedBin(r, np, theFactor, aRgBins);
    // The inverse is unscaled: 1/(nl np) keeps the samples of the chip at their values.
    const float aScale = 1.0f / (static_cast<float>(nl) * np);
    for (int a = 0; a < nl; ++a) {
        const int aRow = fqorvIrfPaddedBin(a, nl, theFactor, aAzBins);
        for (int r = 0; r < np; ++r)
            aOut.mGrid.at(aRow, aRgBin[r]) = aSpectrum[static_cast<std::size_t>(a) * np + r] * aScale;
    }
    FftPlan2D(nl * theFactor, np * theFactor, FftDirection::Inverse, false).execute(aOut.mGrid.mData.data());
    return aOut;
}

CIrfResponse fqorvIrfAnalyseChip(const CIrfChip& theChip, const CIrfOptions& theOptions,
                                 double theAzimuthCentre, double theRangeCentre)
{
    CIrfResponse aResp;
    const CIrfUpsampled aUp = fqorvIrfUpsampleChip(theChip, theOptions.mUpsample, theAzimuthCentre, theRangeCentre);
    const CIrfChip& g = aUp.mGrid;
    const double u = aUp.mFactor;
    aResp.mAzimuthCentre = aUp.mAzimuthCentre;
    aResp.mRangeCentre = aUp.mRangeCentre;

    std::size_t aBest = 0;
    for (std::size_t i = 1; i < g.mData.size(); ++i)
        if (std::norm(g.mData[i]) > std::norm(g.mData[aBest])) aBest = i;
    const double aTop = std::norm(g.mData[aBest]);
    if (!(aTop > 0.0)) {
        aResp.mNote = "no signal in the chip";
        return aResp;
    }
    const int a = static_cast<int>(aBest / g.mPixels);
    const int r = static_cast<int>(aBest % g.mPixels);

    // Both cuts are centred on the grid's peak (index n/2); their measured peaks refine it.
    aResp.mRange = fqorvIrfMeasureCut(periodicCut(g, a, r, true), aUp.mFactor, theOptions.mSidelobeWidths);
    aResp.mAzimuth = fqorvIrfMeasureCut(periodicCut(g, a, r, false), aUp.mFactor, theOptions.mSidelobeWidths);
    const double aDr = aResp.mRange.mPeak - (g.mPixels / 2) / u;    // input samples
    const double aDa = aResp.mAzimuth.mPeak - (g.mLines / 2) / u;
    aResp.mLine = g.mLine0 + a / u + aDa;
    aResp.mPixel = g.mPixel0 + r / u + aDr;
    aResp.mAmplitude = std::sqrt(aTop + (aResp.mRange.mPeakPower - aTop) + (aResp.mAzimuth.mPeakPower - aTop));

    // Near the peak the response is its real envelope times the carrier of the spectrum's centre,
    // so the phase at the refined peak is the grid's phase advanced along that carrier.
    double aPhase = std::arg(g.mData[aBest]) +
                    CQORV_IRF_TWO_PI * (aUp.mAzimuthCentre * aDa + aUp.mRangeCentre * aDr);
    aPhase = std::remainder(aPhase, CQORV_IRF_TWO_PI);
    aResp.mPhaseDeg = aPhase * 360.0 / CQORV_IRF_TWO_PI;

    aResp.mFound = aResp.mRange.mValid && aResp.mAzimuth.mValid;
    if (!aResp.mFound) aResp.mNote = "no 3 dB crossing inside the window";
    else if (aResp.mRange.mClipped || aResp.mAzimuth.mClipped) aResp.mNote = "sidelobe region cut by the window";
    return aResp;
}

void fqorvIrfRegion(double theExpectedLine, double theExpectedPixel, const CIrfOptions& theOptions,
                    int& theLine0, int& thePixel0, int& theSize)
{
    const int h = theOptions.mWindow / 2 + theOptions.mSearch;
    theLine0 = static_cast<int>(std::lround(theExpectedLine)) - h;
    thePixel0 = static_cast<int>(std::lround(theExpectedPixel)) - h;
    theSize = theOptions.mWindow + 2 * theOptions.mSearch;
}

CIrfResponse fqorvIrfAnalyseTarget(const CIrfChip& theRegion, double theExpectedLine,
                                   double theExpectedPixel, const CIrfOptions& theOptions,
                                   double theAzimuthCentre, double theRangeCentre)
{
    const int aL = static_cast<int>(std::lround(theExpectedLine)) - theRegion.mLine0;
    const int aP = static_cast<int>(std::lround(theExpectedPixel)) - theRegion.mPixel0;
    int aBestL = -1;
    int aBestP = -1;
    double aBest = 0.0;
    for (int l = std::max(aL - theOptions.mSearch, 0); l <= std::min(aL + theOptions.mSearch, theRegion.mLines - 1); ++l)
        for (int p = std::max(aP - theOptions.mSearch, 0); p <= std::min(aP + theOptions.mSearch, theRegion.mPixels - 1); ++p)
            if (std::norm(theRegion.at(l, p)) > aBest) {
                aBest = std::norm(theRegion.at(l, p));
                aBestL = l;
                aBestP = p;
            }
    if (aBestL < 0) {
        CIrfResponse aResp;
        aResp.mNote = "no signal near the expected position";
        return aResp;
    }

    const int w = theOptions.mWindow;
    CIrfChip aChip(w, w, theRegion.mLine0 + aBestL - w / 2, theRegion.mPixel0 + aBestP - w / 2);
    for (int l = 0; l < w; ++l) {
        const int rl = aBestL - w / 2 + l;
        if (rl < 0 || rl >= theRegion.mLines) continue;
        for (int p = 0; p < w; ++p) {
            const int rp = aBestP - w / 2 + p;
            if (rp >= 0 && rp < theRegion.mPixels) aChip.at(l, p) = theRegion.at(rl, rp);
        }
    }
    return fqorvIrfAnalyseChip(aChip, theOptions, theAzimuthCentre, theRangeCentre);
}
