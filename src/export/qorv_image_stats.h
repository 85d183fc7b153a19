// Image statistics and the stretch of a float or complex raster to 8 bits: pure kernels that take
// values and buffers. The raster reading lives in qorv_raster_utility.h.
#pragma once

#include <cstdint>

/// A running sum that stays inside the float64 range: above 1.0e14 the sum is divided by 10 and
/// later terms are added divided by the grown divisor. value() = sum x divisor.
struct CGuardedSum {
    double mSum = 0.0;
    double mDivisor = 1.0;
    void add(double theTerm);
    double value() const { return mSum * mDivisor; }
};

/// The central sample window of an image: rows n/2 - n/6 up to (not including) n/2 + n/6, columns
/// likewise, every mInc-th row and column.
struct CSampleWindow {
    int mRowStart, mRowEnd, mColStart, mColEnd, mInc;
};
/// The central third of theLines x thePixels at every second row and column.
CSampleWindow fqorvCentralSampleWindow(int theLines, int thePixels);

/// True when a sampled cell is null: a NaN, or within 1.1754943508222875e-38 of the null value
/// (a complex cell when both parts are).
bool fqorvIsNullCell(double theRe, double theIm, bool theComplex, double theNull);

/// Statistics of the non-null values of a sample. Values of power units (theRootOfValue) are
/// accumulated as sqrt|v|, others as |v|; minimum and maximum are of v itself.
struct CImageStats {
    double mMin = 1.0e9;
    double mMax = -1.0e9;
    bool mNegative = false;  // some value below 0
    long long mCount = 0;
    CGuardedSum mSum, mSumSq;
    double mMean = 0.0;      // set by finish()
    double mStd = 0.0;

    void add(double theValue, bool theRootOfValue);
    /// Mean and standard deviation of the accumulated terms; false with no value.
    bool finish();
};

/// How values map to bytes.
struct CStretch {
    double mScale = 1.0;     // factor of the mapping
    double mExponent = 1.0;  // exponent applied to the window mean (halved for power units)
    bool mSigned = false;    // negative values seen: zero maps to 128
    bool mRounded = false;   // classification: the rounded value itself
};

/// Saturation as the step takes it: |s| not above 1.1754943508222875e-38 becomes 1/3.
double fqorvTiffSaturation(double theSaturation);
/// The stretch of a data unit code from the statistics (ignored for the fixed-scale units 3, 29,
/// 30, 6, 31, 33, 7). theScaleIn below 0 is 1.0; theExponent above -0.9 replaces 1.0.
CStretch fqorvMakeStretch(int theDataUnits, const CImageStats& theStats, double theSaturation, double theScaleIn,
                          double theExponent);
/// Byte of an output pixel whose window holds theCount non-null values of sum theSum: 0 for none,
/// otherwise 1 .. 255 by the stretch.
uint8_t fqorvStretchByte(const CStretch& theStretch, double theSum, int theCount);
