// Pulse timeline of a simulated acquisition: transmit time, PRI code and echo window of every
// pulse, and the records that reach the raw file once the faults are applied.
//
// Lines are counted in pulses: pulse k is transmitted at t_start + the sum of the PRIs before it,
// which is t_start + k / PRF while the PRF does not change. A dropped pulse leaves no record (the
// line counter jumps), a repeated one leaves two records with the same counter and data.
#pragma once

#include <cstdint>
#include <vector>

#include "qorv_sim_scene.h"

/// One record of the raw file.
struct CSimRecord {
    long mPulse = 0;          // pulse index
    uint32_t mCounter = 0;    // line counter in the prefix
    bool mRepeat = false;     // the second copy of a repeated pulse
};

/// Per-pulse timing and codes of a scene.
class CSimTimeline {
public:
    /// Builds the timeline of a completed scene (start time, window, PRF set).
    explicit CSimTimeline(const CSimScene& theScene);

    long pulses() const { return mPulses; }
    /// Transmit time of pulse k (s from the epoch).
    double pulseTime(long k) const;
    /// PRI code and PRF (Hz) in force at pulse k.
    int priCode(long k) const;
    double prf(long k) const;
    /// Sampling window start code of pulse k, and the window's shift from the first pulse's
    /// window in samples (positive: the window opens later).
    int swstCode(long k) const;
    int windowShiftSamples(long k) const;
    /// Two-way delay (s) from the transmit time of pulse k to its first sample. In a native ERS
    /// archive the window is timed from the pulse 9 PRIs earlier, so a PRF change moves it by 9
    /// times the change of the PRI.
    double windowDelay(long k) const;

    /// Fractional pulse index of a time: k + (t - t_k) / (t_{k+1} - t_k), extended linearly
    /// beyond both ends.
    double fractionalPulse(double theTime) const;
    /// The time of a fractional pulse index (inverse of fractionalPulse).
    double timeOfPulse(double thePulse) const;

    const std::vector<CSimRecord>& records() const { return mRecords; }
    /// Record index of the first record of a pulse, -1 when the pulse was dropped.
    long recordOfPulse(long k) const;

private:
    struct PriSegment {
        long mFirst;
        double mStart;   // transmit time of mFirst
        double mPri;
        int mCode;
    };
    const PriSegment& segmentOf(long k) const;

    long mPulses;
    double mTauFirst;
    double mSamplingRate;
    int mSamplesPerCode;
    int mSwstCode0;
    int mWindowRank;   // pulses between the one that times the window and the one it receives
    std::vector<PriSegment> mSegments;
    std::vector<std::pair<long, int>> mSwstSteps;  // sorted: from pulse p on, add n codes
    std::vector<CSimRecord> mRecords;
};
