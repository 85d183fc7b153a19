// The truth file of a point-target scene (written by the raw-data simulators) and the ideal
// responses that follow from its radar parameters.
#pragma once

#include <stdexcept>
#include <string>
#include <vector>

#include "qorv_irf_measure.h"
#include "qorv_json.h"

/// One target of the truth: where the focuser should put its peak.
struct CIrfTarget {
    std::string mId;
    double mLine = 0.0;        // expected_line, image lines
    double mPixel = 0.0;       // expected_pixel, image pixels
    bool mIsolated = true;
    bool mHasPhase = false;    // expected_phase_fd_deg given
    double mPhaseDeg = 0.0;    // expected peak phase of a frequency-domain focuser, degrees
};

/// Ideal figures quoted by the truth's own "theory" block (for comparison only).
struct CIrfFigures {
    bool mSet = false;
    double mIrw = 0.0;
    double mPslrDb = 0.0;
    double mIslrDb = 0.0;
};

/// What the measurement needs of a truth file.
struct CIrfTruth {
    double mWavelength = 0.0;        // m
    double mBandwidth = 0.0;         // chirp bandwidth, Hz
    double mPulseLength = 0.0;       // s; 0 when the file has none
    double mSamplingRate = 0.0;      // Hz
    double mPrf = 0.0;               // Hz
    double mAntennaLength = 0.0;     // m; 0 when the file has none (no pattern in the ideal)
    double mCentroid = 0.0;          // Doppler centroid, Hz
    double mEffectiveVelocity = 0.0; // true processing (effective) velocity, m/s
    double mPlatformVelocity = 0.0;  // speed of the platform from the orbit's state vectors, m/s; 0 without
    std::vector<CIrfTarget> mTargets;
    CIrfFigures mTheoryRange;        // theory.range_chain_ideal
    CIrfFigures mTheoryAzimuth;      // theory.azimuth_centre
};

/// Reads a truth from its JSON value; throws std::runtime_error naming the missing or wrong key.
CIrfTruth fqorvIrfTruthFromJson(const CJson& theJson);
/// Reads a truth file; throws std::runtime_error for a file that can't be read or parsed.
CIrfTruth fqorvIrfReadTruth(const std::string& thePath);

/// The ideal responses for a truth, with the choices that made them.
struct CIrfIdeal {
    CIrfCut mRange;                  // widths in range samples
    CIrfCut mAzimuth;                // widths in lines
    std::string mRangeModel;         // "chirp" (pulse length known) or "band"
    double mAzFraction = 0.8;        // processed azimuth bandwidth, fraction of the PRF
    double mPatternVelocity = 0.0;   // V of the antenna pattern against Doppler, m/s (0: no pattern)
    std::string mVelocitySource;     // "platform", "effective", "option" or "none"
};

/// Ideal range and azimuth responses for a truth: range from the chirp (or the Kaiser band when
/// the pulse length is unknown), azimuth from Kaiser 2.12 over theAzFraction x PRF around the
/// centroid times the antenna pattern. thePatternVelocity above 0 overrides the velocity, which is
/// otherwise the platform's speed, or the effective velocity when the truth has no orbit.
CIrfIdeal fqorvIrfIdealForTruth(const CIrfTruth& theTruth, double theAzFraction, int theUpsample,
                                double thePatternVelocity = 0.0);
