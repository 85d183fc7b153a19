// Range compression kernels: the matched filter of one echo line (mixer, forward transform,
// product with the conjugated replica spectrum, inverse transform), the sampling-window shift of a
// compressed line, the I/Q offset estimate and correction, and the azimuth prefilter taps.
// Values and buffers only; the step (qorv_pre_rc) reads the headers and files.
#pragma once

#include <cstdio>
#include <vector>

#include "qorv_complex.h"
#include "qorv_fft.h"

/// The radar values the matched filter is made from.
struct CRangeChirpParam {
    int mFftSize = 0;             // N, points of the range transforms
    int mLineLength = 0;          // samples of a raw echo line (the replica's window)
    double mSamplingRate = 0.0;   // fs (Hz)
    double mPulseDuration = 0.0;  // tau (s)
    double mBandwidth = 0.0;      // chirp bandwidth (Hz)
    double mCarrier = 0.0;        // carrier frequency (Hz), for the mixer
    const char* mChirp = "";      // "Sensor.Chirp": "UP_CHIRP" or other
    const char* mSpectrum = "";   // "Sensor.Spectrum": "NORMAL" or other
    bool mBaseband = true;        // data at baseband: no mixer
};

/// The matched filter of a run: replica spectrum, mixer and the two plans, made once.
class CRangeCompressor {
public:
    /// Makes the Kaiser-weighted replica and its conjugated spectrum. The replica's point count
    /// must not exceed mFftSize (checked by the caller with fqorvChirpPoints).
    explicit CRangeCompressor(const CRangeChirpParam& theParam);

    /// Compresses theWork[0 .. N-1] in place: mixer (when not at baseband), forward transform,
    /// product with the conjugated spectrum, inverse transform. Unscaled: a unit replica gives N.
    void compress(fcomplex* theWork) const;

    int replicaPoints() const { return mReplicaPoints; }
    const std::vector<double>& replicaWeights() const { return mWeights; }
    int fftSize() const { return mSize; }

private:
    int mSize;
    int mReplicaPoints = 0;
    std::vector<double> mWeights;
    FftBuffer mSpectrum;
    std::vector<fcomplex> mMixer;  // empty at baseband
    FftPlan1D mForward;
    FftPlan1D mInverse;
};

/// Moves the first theLength samples of a compressed line by theShift samples: toward higher
/// indices for a positive shift (the first theShift samples become 0), toward lower ones for a
/// negative shift (the last -theShift of the theLength samples become 0).
void fqorvShiftLine(fcomplex* theLine, int theLength, int theShift);

/// The I/Q offsets of the raw samples and the ratio of the I to the Q standard deviation.
struct CIqOffsets {
    double mI = 0.0;
    double mQ = 0.0;
    double mImbalance = 1.0;
};

/// Sums of the offset estimate over the lines that are not null.
class CIqOffsetEstimate {
public:
    /// Adds theWidth samples; a line whose samples all equal the first (NaN equal to NaN, within
    /// the smallest normal float) is null and left out. Returns false for a null line.
    bool add(const fcomplex* theSamples, int theWidth);
    /// Means and imbalance of what was added (0, 0, 1 when nothing was).
    CIqOffsets result() const;
    long long count() const { return mCount; }

private:
    double mSumI = 0.0, mSumQ = 0.0, mSumI2 = 0.0, mSumQ2 = 0.0;
    long long mCount = 0;
};

/// True when theWidth samples all equal the first exactly (the line loop's null-line test).
bool fqorvIsConstantLine(const fcomplex* theSamples, int theWidth);

/// Subtracts the offsets from theWidth samples: I minus the I offset, Q minus the Q offset times
/// the imbalance.
void fqorvRemoveIqOffsets(fcomplex* theSamples, int theWidth, const CIqOffsets& theOffsets);

/// The azimuth prefilter of presumming factor D: 8 D + 1 taps of the system's band-pass design,
/// band theBandFraction 2 pi / D, centred on the Doppler centroid theCentroidRad (radians per
/// line), in single precision. theListing (may be null) receives one line per tap.
std::vector<fcomplex> fqorvPrefilterTaps(int thePresumming, double theBandFraction, double theCentroidRad,
                                         std::FILE* theListing);
