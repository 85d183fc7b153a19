// Echo generation: the complex baseband echo of every pulse from all point targets, with the
// antenna pattern and thermal noise.
//
// Signal model (the chain's convention): a target at two-way delay tau contributes
//   s(t) = a G(psi) p(t - tau) exp(-j 2 pi f0 tau),  p(t) = exp(j 2 pi (K t / 2 + fstart) t), 0 <= t <= T,
// fstart = -K T / 2, with t the fast time from the pulse's transmit event (the window's first sample
// at t = windowDelay(k)), a the target's complex reflectivity and G the two-way azimuth pattern
// sinc(L sin(psi) / lambda)^2 with sinc(x) = sin(pi x) / (pi x). Stop and go: tau = 2 R(t_k) / c with
// R the range at the pulse's transmit time t_k; neither the satellite's motion during the pulse
// and its echo nor the target's is modelled, as the chain assumes none.
#pragma once

#include <complex>
#include <cstdint>
#include <vector>

#include "qorv_sim_geometry.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"

using CSimSample = std::complex<double>;

/// Generates the echoes of a completed scene, one pulse at a time; thread-safe for distinct pulses.
class CSimEchoGenerator {
public:
    CSimEchoGenerator(const CSimScene& theScene, const CSimOrbit& theOrbit, const CSimTimeline& theTimeline);

    /// The noise-free echo of pulse k: theLine (mSamples values) is overwritten.
    void echo(long k, CSimSample* theLine) const;
    /// Adds complex white Gaussian noise of variance noiseVariance() to the echo of pulse k; the
    /// draws depend only on the seed and k.
    void addNoise(long k, CSimSample* theLine) const;

    /// Variance of the complex noise per sample (E |n|^2), in squared reflectivity units; 0 when off.
    double noiseVariance() const { return mNoiseVariance; }
    /// Pulses that fall inside a processed Doppler band of 0.8 PRF, and the samples of the chirp:
    /// the coherent gains of unweighted matched filters that define the image SNR.
    double azimuthGain() const { return mAzimuthGain; }
    double rangeGain() const { return mRangeGain; }
    /// First and last pulse in which target i lies inside the pattern's extent (last < first: never).
    long firstPulse(std::size_t i) const { return mTargets[i].mFirst; }
    long lastPulse(std::size_t i) const { return mTargets[i].mLast; }
    /// Mean power per sample of the noise-free echoes over theCount pulses spread over the scene.
    double meanSignalPower(int theCount) const;

private:
    struct Target {
        CSimVec3 mPos;
        double mAmplitude;
        double mPhase;  // rad
        long mFirst;
        long mLast;
    };
    void addTarget(const Target& theTarget, const CSimState& theSatellite, double theSinSquint, double theWindow,
                   CSimSample* theLine) const;

    const CSimScene& mScene;
    const CSimOrbit& mOrbit;
    const CSimTimeline& mTimeline;
    std::vector<Target> mTargets;
    std::vector<std::vector<uint32_t>> mBlocks;  // targets lit in each block of mBlockPulses pulses
    long mBlockPulses = 128;
    double mWavelength;
    double mChirpRate;
    double mSinPsiMax;    // extent * lambda / L
    double mNoiseVariance = 0.0;
    double mAzimuthGain = 1.0;
    double mRangeGain = 1.0;
};
