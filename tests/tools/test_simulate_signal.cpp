// The simulator's echoes against the chain's signal convention: delay and carrier phase after
// compression with the chain's replica, Doppler sign, the two-way pattern, window moves, noise.
#include <algorithm>
#include <cmath>
#include <complex>
#include <vector>

#include <gtest/gtest.h>

#include "qorv_sim_echo.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"

namespace {

constexpr double kC = 299792458.0;
constexpr double kPi = CQORV_SIM_PI;

/// A noise-free scene of one target (a 1 x 1 grid: off the image grid, processed aperture inside).
CSimScene oneTarget(const std::string& thePreset, double theCentroid, double theExtent = 2.0, long thePulses = 0)
{
    CSimScene s;
    EXPECT_TRUE(fqorvSimApplyPreset(s, thePreset, false));
    if (thePulses > 0) s.mPulses = thePulses;
    s.mDopplerCentroid = theCentroid;
    s.mNoise = false;
    s.mRadar.mPatternExtent = theExtent;
    s.mGrid = {1, 1};
    fqorvSimCompleteScene(s);
    return s;
}

/// Everything a test needs to generate the echoes of a completed scene.
struct Sim {
    explicit Sim(const CSimScene& theScene)
        : s(theScene), orbit(fqorvSimMakeOrbit(s)), tl(s), gen(s, *orbit, tl), geo(*orbit, s.mRadar.wavelength(), s.mDopplerCentroid)
    {
    }
    std::vector<CSimSample> echo(long k) const
    {
        std::vector<CSimSample> v(static_cast<std::size_t>(s.mSamples));
        gen.echo(k, v.data());
        return v;
    }
    long beamCentrePulse(const CSimVec3& p) const
    {
        return std::lround(tl.fractionalPulse(geo.beamCentreTime(p, geo.zeroDopplerTime(p, tl.pulseTime(s.mPulses / 2)))));
    }
    const CSimScene& s;
    std::unique_ptr<CSimOrbit> orbit;
    CSimTimeline tl;
    CSimEchoGenerator gen;
    CSimGeometry geo;
};

/// The chain's replica: M = trunc(T fs) + 1 points, exp(j 2 pi (t k / 2 + fstart) t), t = i / fs,
/// k = B / T negative for a down chirp, fstart = -T k / 2.
std::vector<CSimSample> chainReplica(const CSimRadar& r)
{
    const int m = static_cast<int>(r.mPulseLength * r.mSamplingRate) + 1;
    const double k = (r.mUpChirp ? 1.0 : -1.0) * r.mBandwidth / r.mPulseLength;
    const double fstart = r.mPulseLength * k * -0.5;
    std::vector<CSimSample> v(static_cast<std::size_t>(m));
    for (int i = 0; i < m; ++i) {
        const double t = i / r.mSamplingRate;
        v[i] = std::polar(1.0, 2.0 * kPi * (t * k / 2.0 + fstart) * t);
    }
    return v;
}

/// Matched filter output at integer lag n: sum of echo(n + i) conj(replica(i)).
CSimSample compress(const std::vector<CSimSample>& theEcho, const std::vector<CSimSample>& theReplica, long n)
{
    CSimSample c{0.0, 0.0};
    for (std::size_t i = 0; i < theReplica.size(); ++i)
        if (n + static_cast<long>(i) >= 0 && n + static_cast<long>(i) < static_cast<long>(theEcho.size()))
            c += theEcho[static_cast<std::size_t>(n) + i] * std::conj(theReplica[i]);
    return c;
}

double wrapDeg(double a) { return std::remainder(a, 360.0); }

/// Band-limited interpolation of samples c at a fractional index x: a sinc under a Kaiser window
/// (beta 8) of +-16 samples.
CSimSample interpolate(const std::vector<CSimSample>& c, double x)
{
    CSimSample v{0.0, 0.0};
    const double aBesselBeta = std::cyl_bessel_i(0.0, 8.0);
    for (long m = static_cast<long>(std::floor(x)) - 15; m <= static_cast<long>(std::floor(x)) + 16; ++m) {
        if (m < 0 || m >= static_cast<long>(c.size())) continue;
        const double u = x - m, w = u / 16.0;
        if (std::fabs(w) >= 1.0) continue;
        const double aSinc = std::fabs(u) < 1e-12 ? 1.0 : std::sin(kPi * u) / (kPi * u);
        v += c[static_cast<std::size_t>(m)] * (aSinc * std::cyl_bessel_i(0.0, 8.0 * std::sqrt(1.0 - w * w)) / aBesselBeta);
    }
    return v;
}

TEST(SimSignal, RangeCompressionPeaksAtTheDelayWithTheCarrierPhase)
{
    for (const char* aPreset : {"ers2", "alos"}) {  // up chirp, down chirp
        const CSimScene s = oneTarget(aPreset, 150.0);
        const Sim sim(s);
        const CSimTarget& t = s.mTargets.at(0);
        const long k = sim.beamCentrePulse(t.mEcef);
        const std::vector<CSimSample> e = sim.echo(k);
        const double R = sim.geo.range(sim.tl.pulseTime(k), t.mEcef);  // stop and go: at transmit time
        const double tau = 2.0 * R / kC;
        const double aDelay = (tau - sim.tl.windowDelay(k)) * s.mRadar.mSamplingRate;
        const std::vector<CSimSample> rep = chainReplica(s.mRadar);

        // The compressed line peaks at the sample nearest the delay, and its band-limited
        // interpolation peaks within a hundredth of a sample of it.
        std::vector<CSimSample> c;
        const long aFrom = static_cast<long>(aDelay) - 24;
        for (long n = aFrom; n <= aFrom + 48; ++n) c.push_back(compress(e, rep, n));
        const long aBest =
            std::max_element(c.begin(), c.end(), [](auto a, auto b) { return std::abs(a) < std::abs(b); }) - c.begin();
        EXPECT_EQ(aFrom + aBest, std::lround(aDelay)) << aPreset;
        double aPeak = 0.0, aPeakValue = 0.0;
        for (double x = aBest - 1.0; x <= aBest + 1.0; x += 0.001)
            if (const double v = std::abs(interpolate(c, x)); v > aPeakValue) aPeakValue = v, aPeak = aFrom + x;
        EXPECT_NEAR(aPeak, aDelay, 0.01) << aPreset;

        // The phase at the peak is the target's phase minus 2 pi f0 tau: the sign of the carrier.
        const double aExpected = t.mPhaseDeg - 360.0 * std::fmod(s.mRadar.mCarrier * tau, 1.0);
        EXPECT_NEAR(wrapDeg(std::arg(c[aBest]) / CQORV_SIM_DEG - aExpected), 0.0, 6.0) << aPreset;
    }
}

/// Doppler centroid by the average phase of the correlation of adjacent lines, Hz in +-PRF/2.
double adjacentLineDoppler(const Sim& sim, long theFirst, long theLast)
{
    CSimSample aSum{0.0, 0.0};
    std::vector<CSimSample> aPrev = sim.echo(theFirst);
    for (long k = theFirst + 1; k <= theLast; ++k) {
        const std::vector<CSimSample> e = sim.echo(k);
        for (std::size_t n = 0; n < e.size(); ++n) aSum += e[n] * std::conj(aPrev[n]);
        aPrev = e;
    }
    return std::arg(aSum) * sim.s.mRadar.mPrf / (2.0 * kPi);
}

TEST(SimSignal, AdjacentLinePhaseGivesTheDopplerCentroidWithItsSign)
{
    // One target in the main lobe only, all of its echoes inside the scene: the estimate is the
    // centroid folded into +-PRF/2, positive for a forward squint.
    for (double fdc : {310.0, -420.0, 2.0 * 1679.902 + 300.0}) {
        const CSimScene s = oneTarget("ers2", fdc, 1.0);
        const Sim sim(s);
        ASSERT_GE(sim.gen.firstPulse(0), 1);
        ASSERT_LE(sim.gen.lastPulse(0), s.mPulses - 2);
        const double aBaseband = fdc - std::round(fdc / s.mRadar.mPrf) * s.mRadar.mPrf;
        EXPECT_NEAR(adjacentLineDoppler(sim, sim.gen.firstPulse(0), sim.gen.lastPulse(0)), aBaseband, 3.0) << fdc;
    }
}

TEST(SimSignal, TwoWayPatternPeaksAtTheBeamCentreAndVanishesAtItsNulls)
{
    const CSimScene s = oneTarget("ers2", 310.0, 2.0, 6000);  // the whole illumination inside
    const Sim sim(s);
    const CSimTarget& t = s.mTargets.at(0);
    const double L = s.mRadar.mAntennaLength, lambda = s.mRadar.wavelength();
    // The echo's amplitude in the middle of its samples is amplitude * sinc(L sin(psi) / lambda)^2.
    auto amplitudeAt = [&](long k) {
        const std::vector<CSimSample> e = sim.echo(k);
        const double tau = 2.0 * sim.geo.range(sim.tl.pulseTime(k), t.mEcef) / kC;
        const long n = std::lround((tau - sim.tl.windowDelay(k)) * s.mRadar.mSamplingRate) + 300;
        return std::abs(e[static_cast<std::size_t>(n)]) / t.mAmplitude;
    };
    auto pulseAtAngle = [&](double thePsi) {
        const double tBc = sim.tl.timeOfPulse(sim.beamCentrePulse(t.mEcef));
        return std::lround(sim.tl.fractionalPulse(sim.geo.timeOfAzimuthAngle(t.mEcef, thePsi, tBc)));
    };
    EXPECT_NEAR(amplitudeAt(sim.beamCentrePulse(t.mEcef)), 1.0, 1e-4);
    // sinc(x)^2 is 1/2 at x = 0.4429, 0 at x = 1, and 0.0472 on the first sidelobe at x = 1.4303.
    for (double aSide : {1.0, -1.0}) {
        EXPECT_NEAR(amplitudeAt(pulseAtAngle(std::asin(aSide * 0.44294647 * lambda / L))), 0.5, 0.01);
        EXPECT_LT(amplitudeAt(pulseAtAngle(std::asin(aSide * lambda / L))), 2e-3);
        EXPECT_NEAR(amplitudeAt(pulseAtAngle(std::asin(aSide * 1.4303 * lambda / L))), 0.0472, 0.002);
    }
    // Beyond the pattern's extent (two nulls) nothing comes back.
    const long aOutside = pulseAtAngle(std::asin(2.0 * lambda / L)) - 3;
    ASSERT_GE(aOutside, 0);
    for (const CSimSample& v : sim.echo(aOutside)) ASSERT_EQ(std::abs(v), 0.0);
}

TEST(SimSignal, WindowMoveShiftsTheEchoByWholeSamples)
{
    CSimScene s = oneTarget("ers2", 290.0);
    s.mFaults.mSwstChanges = {{1800, 22}};  // 88 samples later
    const Sim sim(s);
    auto firstNonZero = [](const std::vector<CSimSample>& e) {
        for (std::size_t n = 0; n < e.size(); ++n)
            if (std::abs(e[n]) > 0.0) return static_cast<long>(n);
        return -1L;
    };
    const long a = firstNonZero(sim.echo(1799)), b = firstNonZero(sim.echo(1800));
    ASSERT_GE(a, 88);
    EXPECT_EQ(a - b, 88);
}

TEST(SimSignal, NoiseHasTheVarianceOfTheImageSnrAndDependsOnlyOnSeedAndPulse)
{
    CSimScene s;
    ASSERT_TRUE(fqorvSimApplyPreset(s, "ers2", false));
    s.mGrid = {0, 0};
    s.mSnrDb = 30.0;
    fqorvSimCompleteScene(s);
    ASSERT_TRUE(s.mTargets.empty());
    const Sim sim(s);
    // SNR of a unit target after unweighted compression: range gain T fs times the azimuth gain,
    // the pulses of 0.8 PRF of Doppler band, PRF^2 0.8 / |fm rate|; 30 dB.
    const double aVariance = 37.12e-6 * 18.96e6 * 0.8 * 1679.9 * 1679.9 / 2113.0 / 1000.0;
    EXPECT_NEAR(sim.gen.noiseVariance() / aVariance, 1.0, 0.005);

    auto noise = [&](long k) {
        std::vector<CSimSample> v(static_cast<std::size_t>(s.mSamples));
        sim.gen.echo(k, v.data());
        sim.gen.addNoise(k, v.data());
        return v;
    };
    double aPower = 0.0, aFourth = 0.0, aBeyond = 0.0;
    CSimSample aMean{0.0, 0.0};
    const double aSigma = std::sqrt(0.5 * sim.gen.noiseVariance());  // of each component
    for (long k = 0; k < 64; ++k) {
        for (const CSimSample& v : noise(k)) {
            aPower += std::norm(v);
            aMean += v;
            for (double x : {v.real() / aSigma, v.imag() / aSigma}) {
                aFourth += x * x * x * x;
                aBeyond += std::fabs(x) > 3.0;
            }
        }
    }
    const double n = 64.0 * s.mSamples;
    EXPECT_NEAR(aPower / n / sim.gen.noiseVariance(), 1.0, 0.01);
    EXPECT_LT(std::abs(aMean / n), 0.02 * std::sqrt(sim.gen.noiseVariance()));
    // Gaussian: kurtosis 3, 0.27 % beyond 3 sigma.
    EXPECT_NEAR(aFourth / (2.0 * n), 3.0, 0.05);
    EXPECT_NEAR(aBeyond / (2.0 * n), 0.0027, 0.0004);
    EXPECT_EQ(noise(5), noise(5));
    EXPECT_NE(noise(5), noise(6));
}

}  // namespace
