// Point-target measurement: peak search, chip extraction, band-limited upsampling and the figures
// of a cut through an impulse response (3 dB width, peak and integrated sidelobe ratios).
//
// Conventions: a chip is row-major, one row per image line (azimuth), one column per pixel (slant
// range). Positions are in input samples: lines along azimuth, pixels along range. Spectra are in
// transform order (bin k of n stands for the frequency k / n of the sampling rate, wrapped).
#pragma once

#include <string>
#include <vector>

#include "qorv_fft.h"

/// Power ratio of the width threshold: the width is measured at half the peak power (-3.01 dB).
inline constexpr double CQORV_IRF_WIDTH_POWER = 0.5;
/// Sidelobes are looked for within this many widths of the peak, on each side.
inline constexpr double CQORV_IRF_SIDELOBE_WIDTHS = 10.0;

/// What the measurement is asked to do.
struct CIrfOptions {
    int mWindow = 32;          // chip size in samples, both directions (even, at least 8)
    int mUpsample = 16;        // upsampling factor of the chip
    int mSearch = 8;           // the peak is looked for within +-mSearch samples of the expected position
    double mSidelobeWidths = CQORV_IRF_SIDELOBE_WIDTHS;
};

/// Figures of one cut through a response. Positions and widths in input samples, ratios in dB.
struct CIrfCut {
    bool mValid = false;           // false when the cut has no 3 dB crossing on one side
    double mPeak = 0.0;            // sub-sample peak position, samples from the cut's first sample
    double mPeakPower = 0.0;       // interpolated peak power |s|^2
    double mIrw = 0.0;             // width at half the peak power, samples
    double mPslrDb = 0.0;          // highest sidelobe beyond the first minima, dB below the peak
    double mIslrDb = 0.0;          // sidelobe energy over main-lobe energy, dB
    double mMinimumLeft = 0.0;     // first minimum before the peak, samples from the peak (negative)
    double mMinimumRight = 0.0;    // first minimum after the peak, samples from the peak
    double mSidelobeExtent = 0.0;  // half extent of the sidelobe region actually used, samples
    bool mClipped = false;         // the sidelobe region was cut short by the end of the cut
};

/// Measures a cut of powers |s|^2 sampled theUpsample times per input sample. The peak is the
/// largest sample; the main lobe runs between the first local minima on either side of it; PSLR
/// and ISLR use the samples beyond the minima up to theSidelobeWidths widths from the peak.
CIrfCut fqorvIrfMeasureCut(const std::vector<double>& thePower, int theUpsample,
                           double theSidelobeWidths = CQORV_IRF_SIDELOBE_WIDTHS);

/// Circular centre of an energy spectrum of n bins in transform order: the angle of
/// sum E(k) exp(j 2 pi k / n), in bins, in [0, n). Uniform energy gives 0.
double fqorvIrfSpectrumCentre(const std::vector<double>& theEnergy);

/// Where bin k of an n-bin spectrum goes in the padded spectrum of theFactor * n bins, when the
/// band is taken to run from theCentre - n/2 to theCentre + n/2 bins (zeros go opposite the centre).
int fqorvIrfPaddedBin(int k, int n, int theFactor, double theCentre);

/// Band-limited upsampling of a 1-D signal by zero padding opposite its spectrum's centre
/// (theCentre in bins; NaN: estimated from the signal). Sample m of the result lies at m / factor.
std::vector<fcomplex> fqorvIrfUpsample1D(const std::vector<fcomplex>& theSignal, int theFactor,
                                         double theCentre);

/// A rectangle of an image: lines x pixels samples, its first sample at (mLine0, mPixel0).
struct CIrfChip {
    int mLines = 0;
    int mPixels = 0;
    int mLine0 = 0;
    int mPixel0 = 0;
    std::vector<fcomplex> mData;  // row-major, mLines * mPixels

    CIrfChip() = default;
    CIrfChip(int theLines, int thePixels, int theLine0, int thePixel0)
        : mLines(theLines), mPixels(thePixels), mLine0(theLine0), mPixel0(thePixel0),
          mData(static_cast<std::size_t>(theLines) * thePixels) {}
    fcomplex& at(int l, int p) { return mData[static_cast<std::size_t>(l) * mPixels + p]; }
    const fcomplex& at(int l, int p) const { return mData[static_cast<std::size_t>(l) * mPixels + p]; }
};

/// A chip upsampled by zero padding in its 2-D spectrum. Sample (a, r) lies at line
/// mLine0 + a / mFactor and pixel mPixel0 + r / mFactor.
struct CIrfUpsampled {
    CIrfChip mGrid;                // mLines = factor * chip lines; mLine0, mPixel0 those of the chip
    int mFactor = 1;
    double mAzimuthCentre = 0.0;   // centre of the azimuth spectrum, cycles per line in [-1/2, 1/2)
    double mRangeCentre = 0.0;     // centre of the range spectrum, cycles per pixel in [-1/2, 1/2)
};

/// Upsamples a chip by theFactor in both directions. The centres of the azimuth and range spectra
/// (cycles per sample; NaN: estimated from the chip's energy) decide where the zeros go, so that a
/// squinted azimuth spectrum centred on its Doppler centroid (wrapped or not) stays in one piece.
CIrfUpsampled fqorvIrfUpsampleChip(const CIrfChip& theChip, int theFactor, double theAzimuthCentre,
                                   double theRangeCentre);

/// Measurement of one point target.
struct CIrfResponse {
    bool mFound = false;           // false: no peak (all zero) or the chip is unusable
    std::string mNote;             // why not, or what limited the measurement
    double mLine = 0.0;            // sub-sample peak position, image lines
    double mPixel = 0.0;           // sub-sample peak position, image pixels
    double mAmplitude = 0.0;       // |s| at the peak
    double mPhaseDeg = 0.0;        // phase of s at the peak, degrees
    double mAzimuthCentre = 0.0;   // spectrum centres used for the upsampling, cycles per sample
    double mRangeCentre = 0.0;     // in [-1/2, 1/2)
    CIrfCut mRange;                // cut along the peak's line
    CIrfCut mAzimuth;              // cut along the peak's pixel
    bool mTouchesEdge = false;     // the chip reached past the image (filled with zeros)
};

/// Analyses a chip centred on a peak: upsampling, sub-sample peak, cuts along range and azimuth.
/// Centres as for fqorvIrfUpsampleChip.
CIrfResponse fqorvIrfAnalyseChip(const CIrfChip& theChip, const CIrfOptions& theOptions,
                                 double theAzimuthCentre, double theRangeCentre);

/// Lines and pixels of the region around an expected position that fqorvIrfAnalyseTarget needs:
/// a square of theOptions.mWindow + 2 mSearch samples; returns its first line and pixel and size.
void fqorvIrfRegion(double theExpectedLine, double theExpectedPixel, const CIrfOptions& theOptions,
                    int& theLine0, int& thePixel0, int& theSize);

/// Finds the brightest sample within mSearch samples of the expected position in a region (any
/// size, zeros outside the image), cuts the window around it and analyses it.
CIrfResponse fqorvIrfAnalyseTarget(const CIrfChip& theRegion, double theExpectedLine,
                                   double theExpectedPixel, const CIrfOptions& theOptions,
                                   double theAzimuthCentre, double theRangeCentre);
