// The chirp replica: point count, rate and start frequency, placement by the delay, the spectrum
// sense, and the compressed response of the weighted replica against its closed form.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <vector>

#include "qorv_chirp.h"
#include "qorvex_test_support.h"

namespace {

const double kPi = std::acos(-1.0);
// ERS-like pulse: 15.55 MHz over 37.12 us, sampled at 18.96 MHz.
const double kB = 15.55e6, kFs = 18.96e6, kTau = 37.12e-6;

std::vector<fcomplex> makeChirp(int theLen, double theDelay, const char* theDir = "UP_CHIRP",
                                const char* theSpectrum = "NORMAL", double f0 = 0.0, double p0 = 0.0,
                                int theWindow = -1, CChirpReplica* theInfo = nullptr)
{
    std::vector<fcomplex> aBuf(theLen);
    const auto aInfo = fqorvMakeChirp(f0, kB, kFs, kTau, theDelay, p0, theWindow < 0 ? theLen : theWindow, theDir,
                                      theSpectrum, 1.0, aBuf.data(), theLen);
    if (theInfo) *theInfo = aInfo;
    return aBuf;
}

TEST(ChirpReplica, PointCountRateAndStartFrequency)
{
    EXPECT_EQ(fqorvChirpPoints(kFs, 0.0), 1);
    const double aTau = 1000.0 / 32e6;
    ASSERT_EQ(32e6 * aTau, 1000.0);
    EXPECT_EQ(fqorvChirpPoints(32e6, aTau), 1001);
    EXPECT_EQ(fqorvChirpPoints(kFs, kTau), 704);  // 703.8 truncated, plus one

    CChirpReplica aUp{}, aDown{};
    makeChirp(800, 0.0, "UP_CHIRP", "NORMAL", 0.0, 0.0, -1, &aUp);
    makeChirp(800, 0.0, "DOWN_CHIRP", "NORMAL", 0.0, 0.0, -1, &aDown);
    EXPECT_EQ(aUp.mPoints, 704);
    EXPECT_DOUBLE_EQ(aUp.mRate, kB / kTau);
    EXPECT_DOUBLE_EQ(aDown.mRate, -kB / kTau);

    // The instantaneous frequency from the phase step: start -B/2 going up, +B/2 going down.
    for (auto [aDir, aSign] : {std::pair{"UP_CHIRP", -1.0}, std::pair{"up_chirp", 1.0}}) {
        const auto s = makeChirp(800, 0.0, aDir);
        const double f = std::arg(s[1] * std::conj(s[0])) * kFs / (2.0 * kPi);
        EXPECT_NEAR(f, aSign * kB / 2.0, 0.02 * kB) << aDir;
    }

    // A pulse of no length: one finite sample of unit amplitude.
    std::vector<fcomplex> aOne(4);
    const auto aZero = fqorvMakeChirp(0.0, kB, kFs, 0.0, 0.0, 0.0, 4, "UP_CHIRP", "NORMAL", 1.0, aOne.data());
    EXPECT_EQ(aZero.mPoints, 1);
    EXPECT_FLOAT_EQ(std::abs(aOne[0]), 1.0f);
    EXPECT_EQ(aOne[1], fcomplex(0.0f));
}

TEST(ChirpReplica, DelayPlacesTheReplicaAndSamplesAreAdded)
{
    const double dt = 1.0 / kFs;
    const auto s = makeChirp(1000, 37.5 * dt);
    // Whole delay ceil(37.5) = 38 samples; the first sample is taken half a sample into the pulse.
    EXPECT_EQ(s[37], fcomplex(0.0f));
    const double t = 0.5 * dt, k = kB / kTau;
    const double aPhase = 2.0 * kPi * (t * k / 2.0 - kTau * k * 0.5) * t;
    EXPECT_NEAR(std::abs(s[38] - fcomplex(std::cos(aPhase), std::sin(aPhase))), 0.0, 1e-6);
    EXPECT_GT(std::abs(s[38 + 703]), 0.5f);
    EXPECT_EQ(s[38 + 704], fcomplex(0.0f));

    // A second generation into the same buffer doubles it.
    std::vector<fcomplex> aTwice = s;
    fqorvMakeChirp(0.0, kB, kFs, kTau, 37.5 * dt, 0.0, 1000, "UP_CHIRP", "NORMAL", 1.0, aTwice.data());
    for (int i = 0; i < 1000; i += 97) EXPECT_EQ(aTwice[i], 2.0f * s[i]) << i;
}

TEST(ChirpReplica, InvertedSpectrumIsTheConjugateAndKeepsTheWeakerBound)
{
    const double f0 = 1.3e6, p0 = 0.4;
    const auto aNormal = makeChirp(800, 0.0, "UP_CHIRP", "NORMAL", -f0, p0);
    const auto aInverted = makeChirp(800, 0.0, "UP_CHIRP", "INVERTED", f0, p0);
    for (int i = 0; i < 704; ++i) ASSERT_NEAR(std::abs(aInverted[i] - std::conj(aNormal[i])), 0.0, 1e-5) << i;

    // With a data window of 500 samples the normal replica stops there; the inverted one fills the buffer.
    const auto aShortNormal = makeChirp(800, 0.0, "UP_CHIRP", "NORMAL", 0.0, 0.0, 500);
    const auto aShortInverted = makeChirp(800, 0.0, "UP_CHIRP", "INVERTED", 0.0, 0.0, 500);
    EXPECT_EQ(aShortNormal[500], fcomplex(0.0f));
    EXPECT_GT(std::abs(aShortInverted[703]), 0.5f);
}

TEST(ChirpReplica, WeightedReplicaCompressesToTheKaiserResponse)
{
    // The point target response of an unweighted echo delayed by D against the weighted replica:
    // r(D) = |sum_n echo_D[n] conj(h[n])|. For a large time-bandwidth product it is the transform of
    // the Kaiser 2.12 window over the band: 3 dB width 1.005 / B and peak sidelobe -19.0 dB.
    const int kLen = 1000, kBase = 150;
    const double dt = 1.0 / kFs;
    auto h = makeChirp(kLen, kBase * dt);
    const auto w = fqorvWeightChirp(h.data() + kBase, 704);
    EXPECT_NEAR(w[0], 1.0 / 2.4815180, 1e-6);  // 1 / I0(2.12)

    const double kStep = 0.05;  // samples
    std::vector<double> r;
    for (double D = -25.0; D <= 25.0 + 1e-9; D += kStep) {
        const auto e = makeChirp(kLen, (kBase + D) * dt);
        std::complex<double> aSum = 0.0;
        for (int n = 0; n < kLen; ++n) aSum += std::complex<double>(e[n]) * std::conj(std::complex<double>(h[n]));
        r.push_back(std::abs(aSum));
    }
    const int c = static_cast<int>(r.size()) / 2;
    ASSERT_EQ(std::max_element(r.begin(), r.end()) - r.begin(), c);  // peak at zero delay
    const double aPeak = r[c];
    int i = c;
    while (r[i] > aPeak / std::sqrt(2.0)) ++i;
    const double aLevel = aPeak / std::sqrt(2.0);
    const double aCross = i - 1 + (r[i - 1] - aLevel) / (r[i - 1] - r[i]);  // linear between grid points
    const double aWidth = 2.0 * (aCross - c) * kStep * dt;                  // seconds
    EXPECT_NEAR(aWidth * kB, 1.005, 0.02);
    while (r[i + 1] < r[i]) ++i;  // first null
    double aSidelobe = 0.0;
    for (; i < static_cast<int>(r.size()); ++i) aSidelobe = std::max(aSidelobe, r[i]);
    const double aPslr = 20.0 * std::log10(aSidelobe / aPeak);
    EXPECT_GT(aPslr, -20.0);
    EXPECT_LT(aPslr, -18.0);
}

TEST(ChirpReplica, ListingIsWrittenOnlyWhenSwitchedOn)
{
    qtest::TempDir aDir;
    auto h = makeChirp(800, 0.0);
    const auto w = fqorvWeightChirp(h.data(), 704);
    const std::string aOut = (aDir / "scene_rc").string();
    fqorvListChirp(aOut.c_str(), h.data(), w, 704);
    EXPECT_FALSE(qtest::fs::exists(aDir / "range_chirp.dat"));
    gQorvChirpListing = true;
    fqorvListChirp(aOut.c_str(), h.data(), w, 704);
    gQorvChirpListing = false;
    const auto aLines = qtest::readLines(aDir / "range_chirp.dat");
    ASSERT_EQ(aLines.size(), 704u);
    char aExpected[96];
    std::snprintf(aExpected, sizeof aExpected, "%5d  %10.5lf  %10.5lf  %10.5lf", 0, w[0], double(h[0].real()),
                  double(h[0].imag()));
    EXPECT_EQ(aLines[0], aExpected);
}

}  // namespace
