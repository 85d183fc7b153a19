// ENVISAT ASAR level 0 written by the simulator, read back from the bytes: the FBAQ code book
// through the importer's decoder, and a small product with its instrument and orbit files against
// the scene's truth (packets walked by their own lengths, counts, flags, codes, the window).
#include <cmath>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "qorv_fbaq.h"
#include "qorv_json.h"
#include "qorv_sim_asar.h"
#include "qorv_sim_format.h"
#include "qorv_sim_geodesy.h"
#include "qorv_sim_options.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_writer.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

constexpr double CQORV_TEST_LIGHT = 299792458.0;

std::vector<uint8_t> bytesOf(const fs::path& thePath)
{
    std::ifstream in(thePath, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}
uint32_t be32(const std::vector<uint8_t>& b, std::size_t theAt) { return fqorvSimGetBE32(b.data() + theAt); }
uint16_t be16(const std::vector<uint8_t>& b, std::size_t theAt) { return fqorvSimGetBE16(b.data() + theAt); }
float beFloat(const std::vector<uint8_t>& b, std::size_t theAt)
{
    const uint32_t u = be32(b, theAt);
    float f;
    std::memcpy(&f, &u, sizeof f);
    return f;
}
std::string text(const std::vector<uint8_t>& b, std::size_t theAt, std::size_t theWidth)
{
    return std::string(reinterpret_cast<const char*>(b.data() + theAt), theWidth);
}
/// The number after KEY= in an ENVISAT-format header text.
long long keyNumber(const std::string& theText, const std::string& theKey)
{
    const std::size_t at = theText.find("\n" + theKey + "=");
    EXPECT_NE(at, std::string::npos) << theKey;
    return at == std::string::npos ? -1 : std::stoll(theText.substr(at + theKey.size() + 2, 21));
}

/// The instrument file's data set: it starts behind the main and specific product headers.
std::size_t instrumentData(const std::vector<uint8_t>& theFile)
{
    return NQORV_SIM_ENVISAT::MPH_SIZE +
           static_cast<std::size_t>(keyNumber(text(theFile, 0, NQORV_SIM_ENVISAT::MPH_SIZE), "SPH_SIZE"));
}

CFbaqTables tablesOf(const std::vector<uint8_t>& theFile)
{
    const std::size_t d = instrumentData(theFile);
    CFbaqTables t;
    for (std::size_t i = 0; i < 4096; ++i) {
        t.mI.push_back(beFloat(theFile, d + NQORV_SIM_ASAR::INS_FBAQ_I + 4 * i));
        t.mQ.push_back(beFloat(theFile, d + NQORV_SIM_ASAR::INS_FBAQ_Q + 4 * i));
    }
    return t;
}

}  // namespace

// Samples of blocks from silence to far beyond the scene's rms, a last short block: the codes the
// encoder writes, decoded with the tables read back from its instrument file, give exactly the
// values it chose, and those values are the nearest levels of a block id that fits the block.
TEST(SimAsar, FbaqCodesDecodeToTheValuesTheEncoderChose)
{
    for (const auto& [n, aBytes] : std::vector<std::pair<int, int>>{{63, 64}, {64, 66}, {1792, 1821}, {6656, 6762}}) {
        EXPECT_EQ(fqorvSimFbaqBytes(n), aBytes);
        EXPECT_EQ(fqorvFbaqSamples(static_cast<std::size_t>(aBytes)), static_cast<std::size_t>(n));
    }
    const int n = 63 * 12 + 17;
    std::mt19937 aRandom(7);
    std::normal_distribution<double> aGauss;
    std::vector<std::complex<double>> x(n);
    for (int i = 0; i < n; ++i) {
        const int aBlock = i / 63;
        const double aRms = aBlock == 0 ? 0.0 : std::exp2(aBlock < 12 ? aBlock - 9 : 9);   // 0, 2^-8 .. 2^2, 2^9
        x[static_cast<std::size_t>(i)] = {aRms * aGauss(aRandom), aRms * aGauss(aRandom)};
    }
    const double aScale = 0.5;
    std::vector<uint8_t> aBlocks(static_cast<std::size_t>(fqorvSimFbaqBytes(n)));
    std::vector<float> aChosen(2 * static_cast<std::size_t>(n));
    fqorvSimFbaqEncoder().encode(x.data(), n, aScale, aBlocks.data(), aChosen.data());

    qtest::TempDir aDir;
    const fs::path aFile = aDir.path() / "ins";
    CSimNativeProduct p;
    p.mClock.mReferenceTime = 0.0;
    CSimAsarValues v;
    v.mValidityStart = 0.0;
    v.mValidityStop = 86400.0;
    fqorvSimWriteAsarInstrument(p, v, fqorvSimFbaqEncoder().tables(), aFile);
    const std::vector<uint8_t> aIns = bytesOf(aFile);
    ASSERT_EQ(aIns.size(), instrumentData(aIns) + NQORV_ASAR::INSTRUMENT_FILE_SIZE);
    const CFbaqTables t = tablesOf(aIns);
    std::vector<float> aDecoded(aChosen.size());
    fqorvDecodeFbaq4(aBlocks.data(), aBlocks.size(), t, aDecoded.data());
    EXPECT_EQ(aDecoded, aChosen);

    // Each value is the nearest of its block's 16, and the block's gain fits its rms within a step.
    for (int i = 0; i < n; ++i) {
        const std::size_t aId = aBlocks[static_cast<std::size_t>(i / 63 * 64)];
        for (int c = 0; c < 2; ++c) {
            const double v = aScale * (c == 0 ? x[static_cast<std::size_t>(i)].real() : x[static_cast<std::size_t>(i)].imag());
            const double aError = std::fabs(aChosen[2 * static_cast<std::size_t>(i) + c] - v);
            for (int m = 0; m < 16; ++m) ASSERT_LE(aError, std::fabs(t.mI[256 * m + aId] - v) + 1e-6) << i;
        }
    }
    for (int b = 1; b < 12; ++b) {
        const double aRms = aScale * std::exp2(b - 9);
        const double aGain = CSimFbaqEncoder::blockGain(aBlocks[64 * static_cast<std::size_t>(b)]);
        EXPECT_NEAR(std::log2(aGain / aRms), 0.0, 0.3) << "block " << b;   // the rms of 63 draws, +-9 %
    }
    EXPECT_EQ(aBlocks[0], 0);             // silence: the smallest gain
    EXPECT_EQ(aBlocks[64 * 12], 255);     // beyond the code book: the largest
}

// A small product: noise packets, a calibration packet, a lost pulse and a window that moves
// earlier, read back as an importer would and held against the truth.
TEST(SimAsar, ProductPacketsAndOutsideFilesStateTheScene)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aRoot = (aEnv.work() / "asar").string();
    CSimScene s;
    CSimCommand c;
    fqorvSimParseCommandLine({"--preset", "envisat", "--format", "n1", "--lines", "300", "--samples", "700", "--targets",
                              "grid:1x1", "--noise-packets", "3", "--cal-packets", "120", "--drop-lines", "50",
                              "--swst-change", "200:-12"},
                             s, c);
    fqorvSimCompleteScene(s);
    fqorvSimRun(s, aRoot);
    const CJson truth = CJson::parseFile(aRoot + "_truth.json");
    for (const char* aPart : {".N1.part", "_ASA_INS_AX.part", "_DOR_VOR_AX.part"}) EXPECT_FALSE(fs::exists(aRoot + aPart));

    // Headers: the data set descriptor counts what follows, the polarisation and swath at their places.
    const std::vector<uint8_t> d = bytesOf(aRoot + ".N1");
    const std::string aMph = text(d, 0, 1247), aSph = text(d, 1247, 1956);
    EXPECT_EQ(aMph.substr(0, 20), "PRODUCT=\"ASA_IM__0PX");
    EXPECT_EQ(aMph.substr(68, 4), ".N1\"");
    EXPECT_EQ(keyNumber(aMph, "TOT_SIZE"), static_cast<long long>(d.size()));
    EXPECT_EQ(aSph.substr(775, 3), "V/V");
    EXPECT_EQ(aSph.substr(789, 3), "IS2");
    const std::size_t aDsd = aSph.find("DS_NAME=\"ASAR_SOURCE_PACKETS");
    ASSERT_NE(aDsd, std::string::npos);
    const std::string aSource = aSph.substr(aDsd - 1, 280);
    EXPECT_EQ(keyNumber(aSource, "DS_OFFSET"), 3203);
    EXPECT_EQ(keyNumber(aSource, "DS_SIZE"), static_cast<long long>(d.size()) - 3203);
    EXPECT_EQ(keyNumber(aSource, "NUM_DSR"), 3 + 299);
    EXPECT_EQ(keyNumber(aSource, "DSR_SIZE"), -1);

    // The instrument file: size, sampling rate, the rank of the beam set, the bias.
    const std::vector<uint8_t> aIns = bytesOf(aRoot + "_ASA_INS_AX");
    const std::size_t aData = instrumentData(aIns);
    ASSERT_EQ(aIns.size(), aData + NQORV_ASAR::INSTRUMENT_FILE_SIZE);
    const double fs = beFloat(aIns, aData + 20);
    EXPECT_EQ(fs, truth["radar"]["sampling_rate"].number());
    EXPECT_EQ(static_cast<double>(beFloat(aIns, aData + 16)), truth["radar"]["f0"].number());
    const double aBias = beFloat(aIns, aData + NQORV_SIM_ASAR::INS_RANGE_GATE_BIAS);
    const int aBeam = 2;
    const int aRank = be16(aIns, aData + NQORV_SIM_ASAR::INS_TIMELINE + 2 * (14 + aBeam - 1));

    // The packets, walked by their own lengths.
    const long aCounter0 = static_cast<long>(truth["raster"]["counter0"].number());
    const double aPrf = truth["radar"]["prf"].number(), t0 = truth["timing"]["t_start"].number();
    const double aEpochSeconds = 10 * 3600 + 18 * 60 + 5.25;   // the preset's epoch: 10:18:05.25
    std::size_t at = 3203;
    int aSwstMin = 65535;
    long aPacket = 0, aPulse = 0;
    while (at < d.size()) {
        const uint16_t L = be16(d, at + 24);
        ASSERT_EQ(be16(d, at + 36), L);
        ASSERT_LE(at + 39 + L, d.size());
        const uint32_t aCount = be32(d, at + 47) & 0xFFFFFF;
        const uint8_t aFlags = d[at + 52];
        EXPECT_EQ(be16(d, at + 38), 29);
        EXPECT_EQ(be16(d, at + 40), 0x54);
        EXPECT_EQ(d[at + 51], aBeam << 2 | 1);
        EXPECT_EQ(be16(d, at + 58), 700);
        EXPECT_EQ(fqorvFbaqSamples(L + 1u - 30u), 700u);
        EXPECT_EQ(be16(d, at + 62) >> 6, std::lround(truth["radar"]["pulse_length"].number() * fs));
        EXPECT_NEAR(d[at + 64] * 16e6 / 255, truth["radar"]["bandwidth"].number(), 1e-6);
        if (aPacket < 3) {
            EXPECT_EQ(aFlags, NQORV_SIM_ASAR::NOISE);
            EXPECT_EQ(aCount, static_cast<uint32_t>(aCounter0 - 3 + aPacket));
        } else {
            EXPECT_EQ(aFlags, aPulse == 120 ? NQORV_SIM_ASAR::CALIBRATION : NQORV_SIM_ASAR::ECHO) << aPulse;
            EXPECT_EQ(aCount, static_cast<uint32_t>(aCounter0 + aPulse));
            EXPECT_EQ(be16(d, at + 54), s.mRadar.mPriCode);
            EXPECT_EQ(fs / be16(d, at + 54), aPrf);
            EXPECT_EQ(be16(d, at + 56), truth["window"]["swst_code0"].number() - (aPulse >= 200 ? 12 : 0));
            // Sensing time: the transmit time truncated to the microsecond.
            const double t = aEpochSeconds + t0 + aPulse / aPrf;
            EXPECT_EQ(static_cast<int32_t>(be32(d, at)), fqorvSimDaysFromCivil(2005, 9, 20) - 10957);
            EXPECT_EQ(be32(d, at + 4) * 1000000LL + be32(d, at + 8), static_cast<long long>(std::floor(t * 1e6)));
            aSwstMin = std::min<int>(aSwstMin, be16(d, at + 56));
            aPulse += aPulse == 49 ? 2 : 1;
        }
        at += 39 + L;
        ++aPacket;
    }
    EXPECT_EQ(at, d.size());
    EXPECT_EQ(aPacket, 3 + 299);

    // The window as the importer computes it from these bytes is the truth's: pixel 0 at the lowest SWST.
    const double aTauFirst = (truth["window"]["swst_code0"].number() + aRank * s.mRadar.mPriCode) / fs - aBias;
    EXPECT_NEAR(aTauFirst, truth["window"]["tau_first"].number(), 1e-15);
    const double aTauLow = (aSwstMin + aRank * s.mRadar.mPriCode) / fs - aBias;
    const CJson& aTarget = truth["targets"][std::size_t{0}];
    EXPECT_NEAR(aTarget["expected_pixel"].number(),
                (aTarget["slant_range"].number() - 0.5 * CQORV_TEST_LIGHT * aTauLow) / (0.5 * CQORV_TEST_LIGHT / fs), 1e-6);

    // The orbit file: 129-byte records a minute apart, five minutes beyond the scene on each side.
    const std::vector<uint8_t> o = bytesOf(aRoot + "_DOR_VOR_AX");
    ASSERT_EQ((o.size() - 1247 - 378) % 129, 0u);
    const std::size_t aVectors = (o.size() - 1247 - 378) / 129;
    EXPECT_EQ(keyNumber(text(o, 1247, 378), "NUM_DSR"), static_cast<long long>(aVectors));
    auto secondsOf = [&](std::size_t k) {
        const std::string r = text(o, 1247 + 378 + 129 * k, 129);
        EXPECT_EQ(r.back(), '\n');
        return std::stoi(r.substr(12, 2)) * 3600.0 + std::stoi(r.substr(15, 2)) * 60.0 + std::stod(r.substr(18, 9));
    };
    EXPECT_EQ(secondsOf(1) - secondsOf(0), 60.0);
    EXPECT_LE(secondsOf(0), aEpochSeconds + t0 - 300.0);
    EXPECT_GE(secondsOf(aVectors - 1), aEpochSeconds + t0 + 300 / aPrf + 300.0);
}
