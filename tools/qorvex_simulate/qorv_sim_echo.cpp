#include "qorv_sim_echo.h"

#include <algorithm>
#include <cmath>

#include "qorv_sim_random.h"

namespace {

constexpr double CQORV_SIM_LIGHT = 299792458.0;

double sinc(double x)
{
    if (std::fabs(x) < 1e-12) return 1.0;
    const double a = CQORV_SIM_PI * x;
    return std::sin(a) / a;
}

/// Adds theCount samples A exp(j (p0 + m d1 + m^2 d2)), m = 0 .. theCount - 1, to theOut. Four
/// interleaved phase recurrences (m = 4 q + j), each a product by a unit rotor whose own rotor
/// turns by the constant exp(j 32 d2): no sine per sample, and four independent chains for the
/// processor to overlap. Each chain starts from exact values, so the rounding over a pulse of
/// a thousand samples stays near 1e-12.
void accumulateChirp(CSimSample* theOut, long theCount, double theAmplitude, double p0, double d1, double d2)
{
    double zr[4], zi[4], wr[4], wi[4];
    for (int j = 0; j < 4; ++j) {
        const double aPhase = p0 + j * d1 + j * j * d2;
        zr[j] = theAmplitude * std::cos(aPhase);
        zi[j] = theAmplitude * std::sin(aPhase);
        const double aStep = 4.0 * d1 + (8.0 * j + 16.0) * d2;
        wr[j] = std::cos(aStep);
        wi[j] = std::sin(aStep);
    }
    const double cr = std::cos(32.0 * d2), ci = std::sin(32.0 * d2);
    double* out = reinterpret_cast<double*>(theOut);  // re, im interleaved
    long m = 0;
    for (; m + 3 < theCount; m += 4) {
        for (int j = 0; j < 4; ++j) {
            out[2 * (m + j)] += zr[j];
            out[2 * (m + j) + 1] += zi[j];
            const double a = zr[j] * wr[j] - zi[j] * wi[j];
            zi[j] = zr[j] * wi[j] + zi[j] * wr[j];
            zr[j] = a;
            const double b = wr[j] * cr - wi[j] * ci;
            wi[j] = wr[j] * ci + wi[j] * cr;
            wr[j] = b;
        }
    }
    for (int j = 0; m + j < theCount; ++j) {
        out[2 * (m + j)] += zr[j];
        out[2 * (m + j) + 1] += zi[j];
    }
}

}  // namespace

CSimEchoGenerator::CSimEchoGenerator(const CSimScene& theScene, const CSimOrbit& theOrbit, const CSimTimeline& theTimeline)
    : mScene(theScene), mOrbit(theOrbit), mTimeline(theTimeline)
{
    const CSimRadar& r = theScene.mRadar;
    mWavelength = r.wavelength();
    mChirpRate = r.chirpRate();
    mSinPsiMax = std::min(0.999, r.mPatternExtent * mWavelength / r.mAntennaLength);
    const double aPsiMax = std::asin(mSinPsiMax);
    const CSimGeometry g(theOrbit, mWavelength, theScene.mDopplerCentroid);
    const long n = theScene.mPulses;
    const double aMiddle = theTimeline.timeOfPulse(0.5 * (n - 1));

    // Illumination of each target: the pulses between the two edges of the pattern's extent.
    mTargets.reserve(theScene.mTargets.size());
    for (const CSimTarget& t : theScene.mTargets) {
        Target a{t.mEcef, t.mAmplitude, t.mPhaseDeg * CQORV_SIM_DEG, 0, -1};
        const double tBc = g.beamCentreTime(t.mEcef, g.zeroDopplerTime(t.mEcef, aMiddle));
        const double aRate = (g.azimuthOffBeam(tBc + 0.01, t.mEcef) - g.azimuthOffBeam(tBc - 0.01, t.mEcef)) / 0.02;
        const double tA = g.timeOfAzimuthAngle(t.mEcef, aPsiMax, tBc + aPsiMax / aRate);
        const double tB = g.timeOfAzimuthAngle(t.mEcef, -aPsiMax, tBc - aPsiMax / aRate);
        a.mFirst = std::max(0L, static_cast<long>(std::floor(theTimeline.fractionalPulse(std::min(tA, tB)))) - 1);
        a.mLast = std::min(n - 1, static_cast<long>(std::ceil(theTimeline.fractionalPulse(std::max(tA, tB)))) + 1);
        mTargets.push_back(a);
    }
    mBlocks.resize(static_cast<std::size_t>((n + mBlockPulses - 1) / mBlockPulses));
    for (std::size_t i = 0; i < mTargets.size(); ++i)
        if (mTargets[i].mFirst <= mTargets[i].mLast)
            for (long b = mTargets[i].mFirst / mBlockPulses; b <= mTargets[i].mLast / mBlockPulses; ++b)
                mBlocks[static_cast<std::size_t>(b)].push_back(static_cast<uint32_t>(i));

    // Noise from the image SNR of a unit target: SNR = rangeGain * azimuthGain / noiseVariance,
    // the gains being the coherent sums of unweighted matched filters over the chirp and over the
    // pulses of a 0.8 PRF Doppler band, taken at mid swath.
    mRangeGain = r.mPulseLength * r.mSamplingRate;
    const int aWidth = theScene.mSamples - fqorvSimReplicaPoints(r);
    const CSimVec3 aMid = g.locate(aMiddle, 0.5 * CQORV_SIM_LIGHT * theScene.mTauFirst + 0.5 * aWidth * r.rangeSpacing(),
                                   theScene.mCentreHeight, theScene.mLookSign, theScene.mEllipsoid);
    const double aRateMid = g.dopplerRate(g.beamCentreTime(aMid, aMiddle), aMid);
    mAzimuthGain = 0.8 * r.mPrf * r.mPrf / std::fabs(aRateMid);
    mNoiseVariance = theScene.mNoise ? mRangeGain * mAzimuthGain / std::pow(10.0, theScene.mSnrDb / 10.0) : 0.0;
}

void CSimEchoGenerator::addTarget(const Target& theTarget, const CSimState& theSatellite, double theSinSquint,
                                  double theWindow, CSimSample* theLine) const
{
    const CSimRadar& r = mScene.mRadar;
    const CSimVec3 d = theTarget.mPos - theSatellite.mPos;
    const double aRange = d.norm();
    const double v = theSatellite.mVel.norm();
    const double aPsi = std::asin(std::clamp(theSatellite.mVel.dot(d) / (v * aRange), -1.0, 1.0)) - std::asin(theSinSquint);
    const double x = r.mAntennaLength * std::sin(aPsi) / mWavelength;
    if (std::fabs(x) > r.mPatternExtent) return;
    const double aGain = sinc(x) * sinc(x);

    const double fs = r.mSamplingRate;
    const double T = r.mPulseLength;
    const double aTau = 2.0 * aRange / CQORV_SIM_LIGHT;
    const double aStart = (aTau - theWindow) * fs;  // fractional sample of the echo's start
    const long n1 = std::max(0L, static_cast<long>(std::ceil(aStart)));
    const long n2 = std::min(static_cast<long>(mScene.mSamples) - 1, static_cast<long>(std::floor(aStart + T * fs)));
    if (n1 > n2) return;

    // Carrier phase -2 pi f0 tau = -2 pi (2 R / lambda), its whole cycles dropped first.
    const double aCycles = 2.0 * aRange / mWavelength;
    const double aCarrier = -2.0 * CQORV_SIM_PI * (aCycles - std::floor(aCycles));
    const double dt = 1.0 / fs;
    const double t1 = theWindow + n1 * dt - aTau;  // fast time within the pulse at sample n1
    const double K = mChirpRate;
    // The chirp phase pi K t (t - T) at t1 + m dt is a quadratic in m: phase0 + m d1 + m^2 d2.
    const double aPhase0 = theTarget.mPhase + CQORV_SIM_PI * K * t1 * (t1 - T) + aCarrier;
    const double d1 = CQORV_SIM_PI * K * dt * (2.0 * t1 - T);
    const double d2 = CQORV_SIM_PI * K * dt * dt;
    accumulateChirp(theLine + n1, n2 - n1 + 1, theTarget.mAmplitude * aGain, aPhase0, d1, d2);
}

void CSimEchoGenerator::echo(long k, CSimSample* theLine) const
{
    std::fill(theLine, theLine + mScene.mSamples, CSimSample(0.0, 0.0));
    const CSimState s = mOrbit.state(mTimeline.pulseTime(k));
    const double aSinSquint = std::clamp(mWavelength * mScene.mDopplerCentroid / (2.0 * s.mVel.norm()), -1.0, 1.0);
    const double aWindow = mTimeline.windowDelay(k);
    for (uint32_t i : mBlocks[static_cast<std::size_t>(k / mBlockPulses)]) {
        const Target& t = mTargets[i];
        if (k >= t.mFirst && k <= t.mLast) addTarget(t, s, aSinSquint, aWindow, theLine);
    }
}

void CSimEchoGenerator::addNoise(long k, CSimSample* theLine) const
{
    if (mNoiseVariance <= 0.0) return;
    CSimRandom aRandom(mScene.mSeed, CQORV_SIM_STREAM_NOISE, static_cast<uint64_t>(k));
    const double aSigma = std::sqrt(0.5 * mNoiseVariance);
    for (int i = 0; i < mScene.mSamples; ++i) {
        const double a = aRandom.gaussian();
        theLine[i] += CSimSample(aSigma * a, aSigma * aRandom.gaussian());
    }
}

double CSimEchoGenerator::meanSignalPower(int theCount) const
{
    std::vector<CSimSample> aLine(static_cast<std::size_t>(mScene.mSamples));
    double aSum = 0.0;
    const long n = mScene.mPulses;
    for (int i = 0; i < theCount; ++i) {
        const long k = std::min(n - 1, static_cast<long>((i + 0.5) * n / theCount));
        echo(k, aLine.data());
        for (const CSimSample& v : aLine) aSum += std::norm(v);
    }
    return aSum / (static_cast<double>(theCount) * mScene.mSamples);
}
