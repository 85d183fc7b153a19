// Native ERS archives written by the simulator, read back byte by byte: the records the chain and
// the importer rely on (lengths and types, codes at their positions, the clock's staircase, the
// leader's and the main product header's values and state vectors) against the scene and its truth.
#include <cmath>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "qorv_json.h"
#include "qorv_sim_format.h"
#include "qorv_sim_native.h"
#include "qorv_sim_options.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_writer.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

std::vector<uint8_t> bytesOf(const fs::path& thePath)
{
    std::ifstream in(thePath, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

uint32_t be32(const std::vector<uint8_t>& b, std::size_t theAt) { return fqorvSimGetBE32(b.data() + theAt); }
uint16_t be16(const std::vector<uint8_t>& b, std::size_t theAt) { return fqorvSimGetBE16(b.data() + theAt); }
std::string text(const std::vector<uint8_t>& b, std::size_t theAt, std::size_t theWidth)
{
    return std::string(reinterpret_cast<const char*>(b.data() + theAt), theWidth);
}
double number(const std::vector<uint8_t>& b, std::size_t theAt, std::size_t theWidth)
{
    return std::stod(text(b, theAt, theWidth));
}
/// Seconds of day of a leader time "YYYYMMDDhhmmssttt".
double leaderSeconds(const std::vector<uint8_t>& b, std::size_t theAt)
{
    const std::string t = text(b, theAt, 17);
    return std::stoi(t.substr(8, 2)) * 3600.0 + std::stoi(t.substr(10, 2)) * 60.0 + std::stoi(t.substr(12, 2)) +
           std::stoi(t.substr(14, 3)) * 1e-3;
}

/// The KEY=value lines of an ENVISAT-format header, values without quotes and units.
std::map<std::string, std::string> keyValues(const std::string& theText)
{
    std::map<std::string, std::string> m;
    std::size_t aFrom = 0;
    while (aFrom < theText.size()) {
        const std::size_t aEnd = theText.find('\n', aFrom);
        const std::string aLine = theText.substr(aFrom, aEnd - aFrom);
        aFrom = aEnd == std::string::npos ? theText.size() : aEnd + 1;
        const std::size_t aEq = aLine.find('=');
        if (aEq == std::string::npos || m.count(aLine.substr(0, aEq))) continue;   // first DSD wins
        std::string v = aLine.substr(aEq + 1);
        if (!v.empty() && v[0] == '"') v = v.substr(1, v.find('"', 1) - 1);
        else v = v.substr(0, v.find('<'));
        m[aLine.substr(0, aEq)] = v;
    }
    return m;
}

class SimNative : public ::testing::Test {
protected:
    /// Parses a command line, completes and runs its scene into theRoot.
    CSimScene simulate(const std::vector<std::string>& theArgs, const std::string& theRoot)
    {
        CSimScene s;
        CSimCommand c;
        fqorvSimParseCommandLine(theArgs, s, c);
        fqorvSimCompleteScene(s);
        fqorvSimRun(s, root(theRoot));
        truth = CJson::parseFile(root(theRoot) + "_truth.json");
        return s;
    }
    std::string root(const std::string& theName) const { return (mEnv.work() / theName).string(); }

    /// The time (s from the epoch) of an on-board clock count.
    double clockTime(uint32_t theTicks) const
    {
        const CJson& c = truth["archive"]["clock"];
        return c["reference_time"].number() + (static_cast<double>(theTicks) - c["reference_ticks"].number()) / 256.0;
    }
    /// The on-board time of pulse n: the clock's count at the latest pulse m <= n divisible by 4.
    uint32_t staircase(long n) const
    {
        const CJson& c = truth["archive"]["clock"];
        const double t = truth["timing"]["t_start"].number() + static_cast<double>(n - n % 4) / truth["radar"]["prf"].number();
        return static_cast<uint32_t>(c["reference_ticks"].number()) +
               static_cast<uint32_t>(std::floor((t - c["reference_time"].number()) * 256.0));
    }

    qtest::InProcessEnvironment mEnv;
    CJson truth;
};

TEST_F(SimNative, CeosArchiveHoldsTheSceneInItsRecords)
{
    const CSimScene s = simulate({"--format", "ceos", "--lines", "400", "--samples", "1024", "--targets", "grid:1x2",
                                  "--drop-lines", "100,101", "--repeat-line", "200", "--swst-change", "300:22",
                                  "--counter-start", "16777200", "--wild-pri", "250", "--corrupt-clock", "260",
                                  "--wild-swst", "270:901"},
                                 "ers");
    const fs::path d = root("ers");
    EXPECT_FALSE(fs::exists(root("ers.part")));
    EXPECT_TRUE(fs::exists(d / "VDF_DAT.001") && fs::exists(d / "NUL_DAT.001"));

    // Leader: the records in order, walked by their own lengths.
    const std::vector<uint8_t> lea = bytesOf(d / "LEA_01.001");
    const std::vector<std::vector<int>> aKinds = {{63, 192, 18, 18}, {10, 10, 31, 20}, {10, 30, 31, 20}, {10, 200, 31, 50}, {10, 200, 31, 50}};
    const std::vector<uint32_t> aLengths = {720, 1886, 1046, 12288, 12288};
    std::size_t at = 0;
    for (std::size_t i = 0; i < aKinds.size(); ++i) {
        EXPECT_EQ(be32(lea, at), i + 1);
        EXPECT_EQ(std::vector<int>(lea.begin() + static_cast<long>(at) + 4, lea.begin() + static_cast<long>(at) + 8), aKinds[i]);
        ASSERT_EQ(be32(lea, at + 8), aLengths[i]);
        at += aLengths[i];
    }
    EXPECT_EQ(at, lea.size());

    // The data set summary states the scene's radar, centre and clock.
    const std::size_t dss = 720;
    const CJson& r = truth["radar"];
    EXPECT_NEAR(number(lea, dss + 500, 16), r["wavelength"].number(), 1e-14);
    EXPECT_NEAR(number(lea, dss + 646, 16), 0.5 * r["chirp_rate"].number(), 1e-3);
    EXPECT_NEAR(number(lea, dss + 710, 16), r["sampling_rate"].number() * 1e-6, 1e-9);
    EXPECT_NEAR(number(lea, dss + 742, 16), r["pulse_length"].number() * 1e6, 1e-9);
    EXPECT_NEAR(number(lea, dss + 934, 16), r["prf"].number(), 1e-9);
    EXPECT_NEAR(number(lea, dss + 116, 16), truth["scene_centre"]["lat"].number(), 1e-9);
    EXPECT_NEAR(number(lea, dss + 132, 16), truth["scene_centre"]["lon"].number(), 1e-9);
    EXPECT_NEAR(number(lea, dss + 484, 8), truth["scene_centre"]["incidence_deg"].number(), 1e-4);
    EXPECT_EQ(number(lea, dss + 818, 16), -9999999.9);
    EXPECT_EQ(text(lea, dss + 396, 4), "ERS2");
    const double aDay = s.mEpoch.mSeconds;   // the scene's times are all on the epoch's day
    EXPECT_NEAR(leaderSeconds(lea, dss + 68), aDay + truth["scene_centre"]["zero_doppler_time"].number(), 0.5e-3);
    // The clock's reference pair: exact in the leader's milliseconds.
    EXPECT_EQ(static_cast<uint32_t>(number(lea, dss + 982, 16)), truth["archive"]["clock"]["reference_ticks"].number());
    EXPECT_NEAR(leaderSeconds(lea, dss + 998), aDay + truth["archive"]["clock"]["reference_time"].number(), 1e-9);

    // Platform position: five vectors from the orbit, one of margin beyond each end of the scene.
    const std::size_t pp = 2606;
    ASSERT_EQ(number(lea, pp + 140, 4), 5);
    const double aFirst = number(lea, pp + 160, 22) - aDay, aStep = number(lea, pp + 182, 22);   // from the epoch
    const double aStart = truth["timing"]["t_start"].number();
    EXPECT_LT(aFirst + aStep, aStart);
    EXPECT_GT(aFirst + 3 * aStep, aStart + 399 / r["prf"].number());
    const std::unique_ptr<CSimOrbit> aOrbit = fqorvSimMakeOrbit(s);
    for (int k = 0; k < 5; ++k) {
        const CSimState e = aOrbit->state(aFirst + k * aStep);
        EXPECT_NEAR(number(lea, pp + 386 + 132 * k + 22, 22), e.mPos.y, 1e-6);
        EXPECT_NEAR(number(lea, pp + 386 + 132 * k + 110, 22), e.mVel.z, 1e-8);
    }

    // Data file: descriptor, then one record per line with the codes at the PGS positions.
    const std::vector<uint8_t> dat = bytesOf(d / "DAT_01.001");
    const CSimTimeline tl(s);
    const std::size_t n = tl.records().size(), L = 11644;
    ASSERT_EQ(dat.size(), (n + 1) * L);
    EXPECT_EQ(number(dat, 180, 6), n);
    EXPECT_EQ(number(dat, 248, 8), 1024);
    EXPECT_EQ(number(dat, 276, 4), 400);
    EXPECT_EQ(number(dat, 288, 4), L - 412 - 2048);
    EXPECT_EQ(text(dat, 400, 28), "COMPLEX UNSIGNED INTEGER    ");
    // The window lies on the grid the archive can state.
    const double aTau = be16(dat, L + 214) * 4.0 / r["sampling_rate"].number() + 9.0 / r["prf"].number() - 6.622e-6;
    EXPECT_NEAR(truth["window"]["tau_first"].number(), aTau, 1e-15);

    // The raw raster of the same scene holds the same samples in the same record order.
    CSimRunReport aReport;
    fqorvSimWriteRaster(s, root("same_raw"), aReport);
    const std::vector<uint8_t> raw = bytesOf(root("same_raw"));
    for (std::size_t i = 0; i < n; ++i) {
        const std::size_t R = (i + 1) * L;
        const long k = tl.records()[i].mPulse;
        ASSERT_EQ(be32(dat, R), i + 2);
        ASSERT_EQ(std::vector<int>(dat.begin() + static_cast<long>(R) + 4, dat.begin() + static_cast<long>(R) + 8), (std::vector<int>{50, 10, 31, 20}));
        ASSERT_EQ(be32(dat, R + 8), L);
        ASSERT_EQ(be32(dat, R + 12), i + 1);
        ASSERT_EQ(dat[R + 202], 0xAA);
        ASSERT_EQ(be32(dat, R + 210), (16777200u + static_cast<uint32_t>(k)) & 0xFFFFFFu) << i;   // wraps at pulse 16
        ASSERT_EQ(be16(dat, R + 214), k == 270 ? 901 : s.mSwstCode0 + (k >= 300 ? 22 : 0)) << i;
        ASSERT_EQ(be16(dat, R + 216), k == 250 ? 0 : 2820) << i;
        ASSERT_EQ(be16(dat, R + 60), 0);
        if (k != 260) {
            ASSERT_EQ(be32(dat, R + 204), staircase(k)) << i;
        }
        ASSERT_EQ(std::memcmp(&dat[R + 412], &raw[i * (412 + 2048) + 412], 2048), 0) << i;
    }
    EXPECT_NE(be32(dat, (tl.recordOfPulse(260) + 1) * L + 204), staircase(260));
    const CJson& g = truth["events"]["garbage"];
    ASSERT_EQ(g.size(), 3u);
    EXPECT_EQ(g[std::size_t{1}]["value"].number(), be32(dat, (tl.recordOfPulse(260) + 1) * L + 204));
}

TEST_F(SimNative, EnvisatFormatHoldsTheSceneInItsRecords)
{
    const CSimScene s = simulate({"--format", "e2", "--lines", "300", "--targets", "grid:1x1", "--drop-lines", "40",
                                  "--repeat-line", "41", "--corrupt-marker", "41:77"},
                                 "ers");
    const std::vector<uint8_t> f = bytesOf(root("ers") + ".E2");
    EXPECT_FALSE(fs::exists(root("ers") + ".E2.part"));
    const CSimTimeline tl(s);
    const std::size_t n = tl.records().size(), L = 11498, H = 3203;
    ASSERT_EQ(f.size(), H + n * L);
    EXPECT_EQ(truth["radar"]["sampling_rate"].number(), NQORV_ERS::SAMPLING_RATE);   // the format's radar

    std::map<std::string, std::string> mph = keyValues(text(f, 0, 1247));
    EXPECT_EQ(mph["PRODUCT"].size(), 62u);
    EXPECT_EQ(mph["PRODUCT"].substr(59), ".E2");
    const CJson& c = truth["archive"]["clock"];
    EXPECT_EQ(std::stod(mph["SAT_BINARY_TIME"]), c["reference_ticks"].number());
    EXPECT_EQ(mph["UTC_SBT_TIME"], fqorvSimHeaderDate(s.mEpoch.plus(c["reference_time"].number())));
    EXPECT_EQ(mph["CLOCK_STEP"], "+3906250000");
    EXPECT_EQ(std::stol(mph["SPH_SIZE"]), 1956);
    EXPECT_EQ(mph["VECTOR_SOURCE"], "FP");
    // The single vector, at the scene centre's time to the us, from the orbit.
    const double tc = truth["scene_centre"]["zero_doppler_time"].number(), aDay = s.mEpoch.mSeconds;
    const CSimState e = fqorvSimMakeOrbit(s)->state(std::round((tc + aDay) * 1e6) / 1e6 - aDay);
    EXPECT_EQ(mph["STATE_VECTOR_TIME"].substr(12), fqorvSimHeaderDate(s.mEpoch.plus(tc)).substr(12));
    EXPECT_NEAR(std::stod(mph["X_POSITION"]), e.mPos.x, 6e-4);
    EXPECT_NEAR(std::stod(mph["Z_VELOCITY"]), e.mVel.z, 6e-7);
    // The first record's clock gives SENSING_START.
    EXPECT_EQ(mph["SENSING_START"], fqorvSimHeaderDate(s.mEpoch.plus(clockTime(be32(f, H + 48)))));

    std::map<std::string, std::string> sph = keyValues(text(f, 1247, 1956));
    EXPECT_EQ(sph["TX_RX_POLAR"], "V/V");
    EXPECT_EQ(text(f, 1247 + 836, 28), "DS_NAME=\"SAR_SOURCE_PACKETS ");
    EXPECT_EQ(std::stol(sph["DS_OFFSET"]), 3203);
    EXPECT_EQ(std::stol(sph["NUM_DSR"]), static_cast<long>(n));
    EXPECT_EQ(std::stol(sph["DSR_SIZE"]), 11498);

    for (std::size_t i = 0; i < n; ++i) {
        const std::size_t R = H + i * L;
        const long k = tl.records()[i].mPulse;
        ASSERT_EQ(be16(f, R + 24), 11465);
        ASSERT_EQ(be32(f, R + 32), k + 1) << i;
        ASSERT_EQ(f[R + 46], k == 41 ? 77 : 0xAA) << i;
        ASSERT_EQ(be32(f, R + 48), staircase(k)) << i;
        ASSERT_EQ(be32(f, R + 54), static_cast<uint32_t>(s.mCounter0 + k)) << i;
        ASSERT_EQ(be16(f, R + 58), s.mSwstCode0);
        ASSERT_EQ(be16(f, R + 60), 2820);
        // Sensing time: MJD2000 days, s, us of the record's clock.
        const double t = aDay + clockTime(be32(f, R + 48));
        ASSERT_EQ(static_cast<int32_t>(be32(f, R)), s.mEpoch.mDay - 10957);
        ASSERT_EQ(be32(f, R + 4) * 1000000LL + be32(f, R + 8), std::llround(t * 1e6)) << i;
    }
}

TEST_F(SimNative, CeosLayoutsPlaceTheAuxiliaryBlockAroundTheCounter)
{
    struct Case {
        CSimCeosLayout layout;
        uint32_t length;
        int prefix, counter, samples;
    };
    for (const Case& c : {Case{CSimCeosLayout::PgsVmp, 11644, 412, 210, 5616}, Case{CSimCeosLayout::Co, 11644, 416, 214, 5614},
                          Case{CSimCeosLayout::Eic, 11644, 410, 198, 5617}, Case{CSimCeosLayout::Ccrs, 12060, 412, 200, 5616},
                          Case{CSimCeosLayout::Asf, 11474, 242, 200, 5616}}) {
        CSimNativeProduct p;
        p.mLayout = c.layout;
        p.mSamples = c.samples;
        p.mStateVectors.resize(5);
        for (int k = 0; k < 5; ++k) p.mStateVectors[k].mTime = 100.0 + 4.2 * k;
        const fs::path d = mEnv.work() / "layout";
        std::unique_ptr<CSimNativeWriter> w = fqorvSimOpenNativeWriter(CSimNativeFormat::Ceos, p, d);
        std::vector<uint8_t> aSamples(2 * static_cast<std::size_t>(c.samples), 17);
        CSimNativeLine l;
        for (uint32_t i = 0; i < 3; ++i) {
            l.mCounter = 1000 + i;
            l.mClock = 5000 + i;
            l.mSwst = static_cast<uint16_t>(900 + i);
            l.mPri = 2820;
            w->writeLine(l, aSamples.data());
        }
        w->finish();
        const std::vector<uint8_t> dat = bytesOf(d / "DAT_01.001");
        SCOPED_TRACE(fqorvSimCeosVariant(c.layout).mName);
        ASSERT_EQ(dat.size(), 4u * c.length);
        EXPECT_EQ(number(dat, 186, 6), c.length);
        EXPECT_EQ(number(dat, 248, 8), c.samples);
        EXPECT_EQ(number(dat, 276, 4), c.prefix - 12);
        EXPECT_EQ(number(dat, 288, 4), static_cast<int>(c.length) - c.prefix - 2 * c.samples);
        const std::size_t R = 2 * c.length, C = R + static_cast<std::size_t>(c.counter);
        EXPECT_EQ(be32(dat, R + 8), c.length);
        EXPECT_EQ(dat[C - 8], 0xAA);
        EXPECT_EQ(be32(dat, C - 6), 5001u);
        EXPECT_EQ(be32(dat, C), 1001u);
        EXPECT_EQ(be16(dat, C + 4), 901);
        EXPECT_EQ(be16(dat, C + 6), 2820);
        EXPECT_EQ(dat[R + static_cast<std::size_t>(c.prefix) - 1], 0);
        EXPECT_EQ(dat[R + static_cast<std::size_t>(c.prefix)], 17);
        EXPECT_EQ(dat[R + static_cast<std::size_t>(c.prefix) + 2 * c.samples - 1], 17);
    }
}

TEST_F(SimNative, ArchivesAreCompleteOrAbsentAndOnlyForErs)
{
    // A writer that does not finish leaves nothing; one that finishes replaces an earlier product
    // but not a directory of other files.
    CSimNativeProduct p;
    p.mStateVectors.resize(2);
    p.mStateVectors[1].mTime = 1.0;
    const fs::path d = mEnv.work() / "prod";
    fqorvSimOpenNativeWriter(CSimNativeFormat::Ceos, p, d).reset();
    EXPECT_FALSE(fs::exists(d) || fs::exists(mEnv.work() / "prod.part"));
    fqorvSimOpenNativeWriter(CSimNativeFormat::Ceos, p, d)->finish();
    fqorvSimOpenNativeWriter(CSimNativeFormat::Ceos, p, d)->finish();
    EXPECT_TRUE(fs::exists(d / "LEA_01.001"));
    qtest::writeFile(d / "notes.txt", "mine");
    EXPECT_THROW(fqorvSimOpenNativeWriter(CSimNativeFormat::Ceos, p, d)->finish(), std::runtime_error);
    EXPECT_TRUE(fs::exists(d / "notes.txt"));

    // The command line: native formats for ERS only, their line widths, garbage only natively.
    for (const std::vector<std::string>& a :
         {std::vector<std::string>{"--preset", "envisat", "--format", "e2"}, {"--format", "e2", "--samples", "1024"},
          {"--format", "ceos", "--ceos-layout", "co", "--samples", "5616"}, {"--wild-pri", "10"},
          {"--format", "ceos", "--bits", "8"}, {"--ceos-layout", "asf"}}) {
        CSimScene s;
        CSimCommand c;
        EXPECT_THROW(
            {
                fqorvSimParseCommandLine(a, s, c);
                fqorvSimCompleteScene(s);
            },
            std::runtime_error)
            << a[0] << " " << a[1];
    }
    // ERS-1 is written as .E1.
    simulate({"--preset", "ers1", "--format", "e2", "--lines", "64", "--targets", "grid:1x1", "--no-noise"}, "one");
    EXPECT_TRUE(fs::exists(root("one") + ".E1"));
    EXPECT_EQ(truth["archive"]["path"].string(), "one.E1");
}

}  // namespace
