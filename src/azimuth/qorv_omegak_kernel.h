// The omega-k block focuser: one azimuth block of range compressed lines, carried into the 2-D
// frequency domain, Stolt-mapped to first order, multiplied by the reference phase and the azimuth
// weights, and returned to the image domain. Plans, block and per-bin tables are made once.
//
// In the precise mode the block keeps every stage and adds what the first-order mapping and the
// one processing velocity leave: the reference range lies at the block's middle column, the bins
// are labelled with their own frequencies, and between the inverse range and the inverse azimuth
// transforms each range column takes the exact azimuth phase of its own effective velocity.
#pragma once

#include <algorithm>
#include <memory>
#include <vector>

#include "qorv_complex.h"
#include "qorv_fft.h"
#include "qorv_matrix.h"

/// The constants of a focusing run. Frequencies in Hz, ranges in m, velocity in m/s.
struct COmegaKParam {
    int mAzimuthFftSize = 0;       // nazft, rows of the block
    int mRangeFftSize = 0;         // nrfft, columns of the block
    double mPrf = 0.0;
    double mSamplingRate = 0.0;    // fs
    double mCarrierFrequency = 0.0;  // f0
    double mVelocity = 0.0;        // processing velocity v
    double mNearRange = 0.0;       // r0, slant range of column 0
    double mBandFraction = 0.0;    // processed part of the azimuth band
    int mPresumming = 1;           // psf
    int mDecimation = 1;           // ndec
    bool mHalfPixelShift = false;  // adds a half-line shift to the reference phase
    bool mPrecise = false;         // the precise mode (column velocities, exact azimuth phase)
};

/// Doppler bin of the block: nint(nazft ws2 / (2 pi)) modulo nazft, where ws2 (radians per
/// decimated line) is the centroid's phase step; nint rounds halves away from zero.
int fqorvDopplerBin(double theWs2, int theAzimuthFftSize);

class COmegaKBlockFocuser {
public:
    /// Makes the block (nazft x nrfft, zeroed), the plans and the range tables. FFTW threads serve
    /// the column and 2-D transforms; theThreads also runs the per-sample loops.
    COmegaKBlockFocuser(const COmegaKParam& theParam, int theThreads = 1);

    CQorvMatrix<fcomplex>& block() { return mBlock; }
    const COmegaKParam& param() const { return mParam; }

    /// Per-bin tables for a block: Doppler centroid theCentroid (Hz) with its bin theDopplerBin, and
    /// the centring shift theShift (lines). Fills kx, kx2, az and the Kaiser 2.12 weights.
    void setDoppler(double theCentroid, int theDopplerBin, double theShift);

    /// Precise mode: the effective velocity (m/s) of each of the nrfft range columns.
    void setColumnVelocities(const std::vector<double>& theVelocities);

    /// Every azimuth bin weighted 1: the look steps focus without the azimuth weights.
    void setUniformWeights() { std::fill(mWeight.begin(), mWeight.end(), 1.0f); }

    /// The whole focusing of the block in place: azimuth FFT, Stolt mapping, range FFT, reference
    /// phase with weights and scale, inverse 2-D FFT.
    void focus();

    // The stages of focus(), public for the tests and the benchmark.
    void azimuthTransform();
    void stoltMapping();
    void rangeTransform();
    /// Reference phase through double-precision recurrences along the azimuth bins.
    void referencePhase();
    /// The same, each sample's sine and cosine evaluated directly (reference for the tests).
    void referencePhaseDirect();
    void inverseTransform();
    /// Precise mode: the inverse transform in two halves with the column phase between them.
    void rangeInverseTransform();
    /// Precise mode, in the range-time / azimuth-frequency domain: each column's residual azimuth
    /// phase, the exact hyperbola of its own velocity less what the block stages compensated.
    void columnPhase();
    void azimuthInverseTransform();

    /// Clears rows 0 .. min(theM1, nazft)-1 and nazft-theM2 .. nazft-1 of column theColumn.
    void clearGuards(int theColumn, int theM1, int theM2);

    /// Azimuth frequency (Hz) of bin b for the current Doppler set-up.
    double binFrequency(int b) const;
    const std::vector<float>& weights() const { return mWeight; }

private:
    int signedBinDistance(int b) const;
    double halfShift(int b) const;
    /// The residual azimuth phase (radians) at azimuth wavenumber theKx and range column theColumn.
    double residualPhase(double theKx, int theColumn) const;

    COmegaKParam mParam;
    int mThreads;
    CQorvMatrix<fcomplex> mBlock;
    FftPlanColumns mAzimuthPlan;
    FftPlan1D mRangePlan;
    // The inverse: one 2-D plan in the block mode, rows and columns apart in the precise mode.
    std::unique_ptr<FftPlan2D> mInversePlan;
    std::unique_ptr<FftPlan1D> mRangeInversePlan;
    std::unique_ptr<FftPlanColumns> mAzimuthInversePlan;
    double mReferenceColumn = 0.0;      // column of the reference range: 0, or nrfft/2 when precise
    double mNearSamples = 0.0;          // slant range of column 0 in range samples
    std::vector<double> mVelocityRatio2;  // precise: (v / Vr[n])^2 per column
    double mK0 = 0.0;                   // 2 pi f0 / fs, radians per range sample
    double mScale = 0.0;                // 1 / (nazft nrfft)
    std::vector<double> mKr;            // 2 (k0 + w[n]) / nr0
    std::vector<double> mInverseKr;     // 1 / kr[n]
    std::vector<double> mKx, mKx2, mAz; // per azimuth bin
    std::vector<float> mWeight;         // azimuth weights
    double mCentroid = 0.0;
    int mDopplerBin = 0;
    double mShift = 0.0;
};
