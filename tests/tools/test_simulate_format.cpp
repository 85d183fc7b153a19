// Raw sample formats and line prefixes: the 5-bit quantiser's range, offset and error, the
// block-adaptive 4-bit quantiser's distortion, the prefix fields at their byte positions
// (big-endian) for the three sensors, and the scene's checks of bad options.
#include <cmath>
#include <complex>
#include <stdexcept>
#include <vector>

#include <gtest/gtest.h>

#include "qorv_sim_format.h"
#include "qorv_sim_options.h"
#include "qorv_sim_random.h"
#include "qorv_sim_scene.h"

namespace {

std::vector<std::complex<double>> gaussian(int n, double theSigma, uint64_t theSeed)
{
    CSimRandom r(theSeed, 99, 0);
    std::vector<std::complex<double>> v(static_cast<std::size_t>(n));
    for (auto& x : v) {
        double a, b;
        r.gaussianPair(a, b);
        x = {theSigma * a, theSigma * b};
    }
    return v;
}

TEST(SimFormat, FiveBitCodesAreUnbiasedAroundFifteenAndAHalf)
{
    const double g = 4.5;  // codes per unit: unit-variance components get an rms of 4.5 codes
    const std::vector<std::complex<double>> in = gaussian(200000, 1.0, 7);
    std::vector<uint8_t> out(2 * in.size());
    const long aClipped = fqorvSimQuantise5Bit(in.data(), static_cast<int>(in.size()), g, out.data());
    double aSum = 0.0, aSq = 0.0;
    long aBeyond = 0;
    for (std::size_t i = 0; i < in.size(); ++i)
        for (int c = 0; c < 2; ++c) {
            const uint8_t q = out[2 * i + c];
            ASSERT_LE(q, 31);
            const double x = c == 0 ? in[i].real() : in[i].imag();
            if (std::fabs(x * g) < 15.5) {
                EXPECT_LE(std::fabs(fqorvSimDecode5Bit(q, g) - x), 0.5 / g + 1e-12);
            } else {
                ++aBeyond;
            }
            aSum += q;
            aSq += (q - 15.5) * (q - 15.5);
        }
    const double n = 2.0 * in.size();
    EXPECT_NEAR(aSum / n, 15.5, 0.02);
    // rms: the input's 4.5 codes plus the uniform quantisation noise of 1/12 code^2.
    EXPECT_NEAR(std::sqrt(aSq / n), std::sqrt(4.5 * 4.5 + 1.0 / 12.0), 0.03);
    // Components beyond +-16 codes (3.56 sigma) are clipped; counted as such.
    EXPECT_NEAR(static_cast<double>(aClipped) / n, 2.0 * 0.5 * std::erfc(16.0 / 4.5 / std::sqrt(2.0)), 1e-4);
    EXPECT_LE(aClipped, aBeyond);

    const std::complex<double> aExtremes[2] = {{-100.0, 100.0}, {0.0, -1e-9}};
    uint8_t aCodes[4];
    EXPECT_EQ(fqorvSimQuantise5Bit(aExtremes, 2, g, aCodes), 2);
    EXPECT_EQ(aCodes[0], 0);
    EXPECT_EQ(aCodes[1], 31);
    EXPECT_EQ(aCodes[2], 16);  // 0 lies on the boundary: the code above it
    EXPECT_EQ(aCodes[3], 15);
}

TEST(SimFormat, BlockAdaptiveFourBitsKeepsTheGaussianDistortionOfLloydMax)
{
    // Blocks of very different power: each is scaled by its own rms, so the signal-to-quantisation
    // ratio is that of the 16-level Lloyd-Max quantiser (20.2 dB) in every block.
    std::vector<std::complex<double>> in = gaussian(64 * 400, 1.0, 3);
    for (std::size_t i = 0; i < in.size(); ++i) in[i] *= std::pow(10.0, (i / 64 % 5) - 2.0);
    std::vector<float> out(2 * in.size());
    const long aSaturated = fqorvSimQuantiseBaq4Bit(in.data(), static_cast<int>(in.size()), out.data());
    for (int aBlockPower = 0; aBlockPower < 5; ++aBlockPower) {
        double aSignal = 0.0, aError = 0.0;
        for (std::size_t i = 0; i < in.size(); ++i) {
            if (static_cast<int>(i / 64 % 5) != aBlockPower) continue;
            aSignal += std::norm(in[i]);
            aError += std::norm(in[i] - std::complex<double>(out[2 * i], out[2 * i + 1]));
        }
        EXPECT_NEAR(10.0 * std::log10(aSignal / aError), 20.2, 0.6) << aBlockPower;
    }
    // About 2 x 0.82 % of Gaussian components lie beyond the outermost decision level 2.4008.
    EXPECT_NEAR(static_cast<double>(aSaturated) / (2.0 * in.size()), std::erfc(2.4008 / std::sqrt(2.0)), 0.004);
}

TEST(SimFormat, PrefixFieldsStandBigEndianAtTheSensorsPositions)
{
    struct Case {
        const char* mPreset;
        int mSize, mCounter, mSwst, mPri, mRange;
    };
    for (const Case c : {Case{"ers2", 412, 210, 214, 60, -1}, Case{"envisat", 64, 54, 58, 60, -1},
                         Case{"alos", 412, 12, -1, 60, 116}}) {
        CSimScene s;
        ASSERT_TRUE(fqorvSimApplyPreset(s, c.mPreset, false));
        const CSimPrefixLayout& p = s.mPrefix;
        ASSERT_EQ(p.mSize, c.mSize);
        CSimPrefixValues v;
        v.mCounter = 0x01020304u;
        v.mSwstCode = -2;
        v.mPriCode = 2820;
        v.mSlantRange = 852345;
        std::vector<uint8_t> a(static_cast<std::size_t>(p.mSize)), b(a.size());
        fqorvSimEncodePrefix(p, v, 1, 10, a.data());
        fqorvSimEncodePrefix(p, v, 1, 11, b.data());
        const std::vector<uint8_t> aCounter{1, 2, 3, 4};
        EXPECT_EQ(std::vector<uint8_t>(a.begin() + c.mCounter, a.begin() + c.mCounter + 4), aCounter) << c.mPreset;
        if (c.mSwst >= 0) {
            EXPECT_EQ(static_cast<int16_t>(fqorvSimGetBE16(&a[c.mSwst])), -2);
        }
        EXPECT_EQ(a[c.mPri] * 256 + a[c.mPri + 1], 2820);
        if (c.mRange >= 0) {
            EXPECT_EQ(fqorvSimGetBE32(&a[c.mRange]), 852345u);
        }
        // The other bytes are noise, different in every record.
        int aSame = 0;
        for (std::size_t i = 0; i < a.size(); ++i) aSame += a[i] == b[i];
        EXPECT_LT(aSame, 16 + static_cast<int>(a.size()) / 64) << c.mPreset;
    }
    // The PRF of the PRI codes: ERS (code + 2) * 210.94 ns, ENVISAT code / fs, and back.
    CSimScene s;
    ASSERT_TRUE(fqorvSimApplyPreset(s, "ers2", false));
    EXPECT_NEAR(fqorvSimPrfOfCode(s.mPrefix, 18.96e6, 2820), 1679.90239364, 1e-6);
    ASSERT_TRUE(fqorvSimApplyPreset(s, "envisat", false));
    EXPECT_NEAR(fqorvSimPrfOfCode(s.mPrefix, 19.20768e6, 11624), 19.20768e6 / 11624, 1e-9);
    EXPECT_EQ(fqorvSimCodeOfPrf(s.mPrefix, 19.20768e6, 1652.41), 11624);
}

/// Parses a command line and completes its scene; the message of the first failure, or "".
std::string failureOf(const std::vector<std::string>& theArgs)
{
    try {
        CSimScene s;
        CSimCommand c;
        fqorvSimParseCommandLine(theArgs, s, c);
        fqorvSimCompleteScene(s);
    } catch (const std::runtime_error& e) {
        return e.what();
    }
    return "";
}

TEST(SimOptions, BadOptionsAreRefusedWithAMessageAndGoodOnesReachTheScene)
{
    const std::vector<std::pair<std::vector<std::string>, std::string>> aBad = {
        {{"--preset", "radarsat"}, "unknown preset"}, {{"--lines", "12x"}, "not a whole number"},
        {{"--frobnicate"}, "unknown option"}, {{"--snr"}, "needs a value"},
        {{"--drop-lines", "0"}, "outside"},  // lines count from pulse 0
        {{"--lines", "100", "--repeat-line", "100"}, "outside"}, {{"--swst-change", "40"}, "PULSE:VALUE"},
        {{"--swst-change", "40:0"}, "changes nothing"}, {{"--samples", "600"}, "cannot hold the chirp"},
        {{"--preset", "alos", "--prf-change", "50:70000"}, "outside"}, {{"--targets", "grid:3"}, "grid:RxC"},
        {{"--scene", "/nonexistent/scene.json"}, "--scene"}};
    for (const auto& [aArgs, aWords] : aBad)
        EXPECT_NE(failureOf(aArgs).find(aWords), std::string::npos) << aArgs[0] << ": " << failureOf(aArgs);

    CSimScene s;
    CSimCommand c;
    fqorvSimParseCommandLine({"--preset", "envisat", "--lines", "2000", "--samples", "1100", "--doppler-centroid",
                              "-2500", "--drop-lines", "7,9", "--repeat-line", "11", "--swst-change", "300:-5",
                              "--prf-change", "400:11700", "--seed", "77", "--no-noise", "--out", "x/y"},
                             s, c);
    fqorvSimCompleteScene(s);
    EXPECT_EQ(s.mRadar.mSensorName, "ENVISAT-1");
    EXPECT_EQ(s.mDopplerCentroid, -2500.0);
    EXPECT_EQ(s.mFaults.mDroppedPulses, (std::vector<long>{7, 9}));
    EXPECT_EQ(s.mFaults.mRepeatedPulses, (std::vector<long>{11}));
    EXPECT_EQ(s.mFaults.mSwstChanges.at(0), (std::pair<long, int>{300, -5}));
    EXPECT_EQ(s.mFaults.mPrfChanges.at(0), (std::pair<long, int>{400, 11700}));
    EXPECT_EQ(s.mSeed, 77u);
    EXPECT_EQ(s.mTargets.size(), 16u);  // the preset's 4 x 4 grid
}

}  // namespace
