// The omega-k block parameters of an ERS scene, shared by the focusing benchmarks.
#pragma once

#include "qorv_omegak_kernel.h"

/// An ERS-like block of theAzimuthFftSize x theRangeFftSize samples (C band, 1679.9 Hz PRF).
inline COmegaKParam fqorvBenchErsBlock(int theAzimuthFftSize, int theRangeFftSize)
{
    COmegaKParam p;
    p.mAzimuthFftSize = theAzimuthFftSize;
    p.mRangeFftSize = theRangeFftSize;
    p.mPrf = 1679.9;
    p.mSamplingRate = 18.96e6;
    p.mCarrierFrequency = 5.3e9;
    p.mVelocity = 7100.0;
    p.mNearRange = 845000.0;
    p.mBandFraction = 0.8;
    return p;
}
