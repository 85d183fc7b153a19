// Raw products end to end, read back through the project's store and raster classes: the header
// holds what the chain reads (mandatory list, window, PRF, velocity, dates, state vectors), the
// prefixes hold counters, window and PRI codes at their byte positions with the injected faults,
// the samples are in the sensor's format; and the tool's command line.
#include <cmath>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_json.h"
#include "qorv_raster_file.h"
#include "qorv_sim_format.h"
#include "qorv_sim_options.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_writer.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;
constexpr double kC = 299792458.0;

/// Parses a command line, completes and runs its scene into theRoot.
CSimScene simulate(const std::vector<std::string>& theArgs, const std::string& theRoot)
{
    CSimScene s;
    CSimCommand c;
    fqorvSimParseCommandLine(theArgs, s, c);
    fqorvSimCompleteScene(s);
    fqorvSimRun(s, theRoot);
    return s;
}

/// A product read back: header, truth, prefixes and sample bytes of every record.
struct Product {
    explicit Product(const std::string& theRoot) : header(CDescriptionHeader::makeFull())
    {
        EXPECT_TRUE(header->read(theRoot.c_str(), true));
        truth = CJson::parseFile(theRoot + "_truth.json");
        CRasterFileParam p;
        fqorvRasterParamFromHeader(*header, theRoot.c_str(), p);
        CRasterFile f;
        f.openRead(p);
        records = f.getNrOfLines();
        prefixes.resize(static_cast<std::size_t>(records));
        samples.resize(static_cast<std::size_t>(records));
        for (int r = 0; r < records; ++r) {
            prefixes[r].resize(static_cast<std::size_t>(f.getRowPrefix()));
            f.readRowPrefix(r, prefixes[r].data());
            samples[r].resize(static_cast<std::size_t>(f.getLineBytes()));
            f.readLines(r, 1, 0, f.getNrOfPixels() - 1, samples[r].data());
        }
        f.close();
    }
    uint32_t be32(int r, int thePos) const { return fqorvSimGetBE32(&prefixes[r][thePos]); }
    int be16(int r, int thePos) const { return static_cast<int16_t>(fqorvSimGetBE16(&prefixes[r][thePos])); }
    double num(const char* theKey, int n = 0) const { return (*header)[theKey].getDouble(n); }

    std::unique_ptr<CDescriptionHeader> header;
    CJson truth;
    int records = 0;
    std::vector<std::vector<uint8_t>> prefixes;
    std::vector<std::vector<uint8_t>> samples;
};

class SimOutput : public ::testing::Test {
protected:
    qtest::InProcessEnvironment mEnv;
    std::string root(const char* theName) const { return (mEnv.work() / theName).string(); }
};

TEST_F(SimOutput, Ers2ProductCarriesTheChainsFieldsAndTheFaults)
{
    const std::string r = root("ers");
    const CSimScene s = simulate({"--lines", "1200", "--samples", "1024", "--targets", "grid:2x2", "--drop-lines",
                                  "100,101", "--repeat-line", "200", "--swst-change", "300:22", "--prf-change",
                                  "400:2800", "--seed", "5"},
                                 r);
    EXPECT_TRUE(fs::exists(r));
    EXPECT_FALSE(fs::exists(r + ".part"));
    const Product p(r);

    // Header: the mandatory list of raw inputs, and the values the chain takes from it.
    EXPECT_TRUE(p.header->checkMandatory("raw_input", false));
    EXPECT_EQ((*p.header)["RasterInfo.NrOfLinesPerImage"].getInteger(), 1199);
    EXPECT_EQ((*p.header)["RasterInfo.NrOfPixelsPerLine"].getInteger(), 1024);
    EXPECT_EQ((*p.header)["RasterInfo.RowPrefix"].getInteger(), 412);
    EXPECT_STREQ((*p.header)["RasterInfo.CellType"].getString(), "UBYTE_COMPLEX");
    EXPECT_STREQ((*p.header)["Sensor.Chirp"].getString(), "UP_CHIRP");
    EXPECT_NEAR(p.num("ChannelInfo.PRF"), 1679.9023936, 1e-6);
    EXPECT_EQ(p.num("ChannelInfo.PRFExtracted"), p.num("ChannelInfo.PRF"));
    const double tau = p.truth["window"]["tau_first"].number();
    EXPECT_NEAR(p.num("Processing.FastTime"), tau, 1e-15);
    EXPECT_NEAR(p.num("Processing.SlantRange"), 0.5 * kC * tau, 1e-6);
    EXPECT_NEAR(p.num("Processing.ProcessingVelocity"), 7108.0, 15.0);
    EXPECT_FALSE((*p.header)["Processing.DopCenRangeCoeff"].isInitialised());  // left to the estimator

    // State vectors: ECR, at least 5, equal to the truth's orbit, around the image centre.
    const int n = (*p.header)["StateVectorData.nStateVectors"].getInteger();
    EXPECT_GE(n, 5);
    EXPECT_STREQ((*p.header)["StateVectorData.StateVectorReference"].getString(), "ECR");
    const CJson& v = p.truth["orbit"]["state_vectors"];
    ASSERT_EQ(v["pos"].size(), static_cast<std::size_t>(n));
    for (int i = 0; i < n; ++i) {
        EXPECT_NEAR(p.num("StateVectorData.pos_y", i), v["pos"][i][1].number(), 1e-6);
        EXPECT_NEAR(p.num("StateVectorData.vel_z", i), v["vel"][i][2].number(), 1e-9);
    }
    const double aMid = p.truth["scene_centre"]["zero_doppler_time"].number();
    EXPECT_GT(aMid, v["times"][std::size_t{0}].number() + 10.0);
    EXPECT_LT(aMid, v["times"][n - 1].number() - 10.0);

    // Prefixes: counter at 210 (jumping over the dropped pulses, repeated once), SWST code at 214
    // (22 codes more from pulse 300), PRI code at 60 (2800 from pulse 400).
    ASSERT_EQ(p.records, 1199);
    const uint32_t c0 = p.be32(0, 210);
    EXPECT_EQ(c0, static_cast<uint32_t>(s.mCounter0));
    EXPECT_EQ(p.be16(0, 214), s.mSwstCode0);
    for (int rec = 0; rec < p.records; ++rec) {
        const long aPulse = rec < 100 ? rec : (rec <= 198 ? rec + 2 : rec + 1);
        ASSERT_EQ(p.be32(rec, 210) - c0, static_cast<uint32_t>(aPulse)) << rec;
        ASSERT_EQ(p.be16(rec, 214), s.mSwstCode0 + (aPulse >= 300 ? 22 : 0)) << rec;
        ASSERT_EQ(fqorvSimGetBE16(&p.prefixes[rec][60]), aPulse >= 400 ? 2800 : 2820) << rec;
    }
    // The repeated record is a byte-for-byte copy.
    EXPECT_EQ(p.prefixes[198], p.prefixes[199]);
    EXPECT_EQ(p.samples[198], p.samples[199]);
    EXPECT_NE(p.samples[197], p.samples[198]);

    // The writer's gain gives the 5-bit samples an rms of 4.5 codes around 15.5.
    double aSum = 0.0, aSq = 0.0, aCount = 0.0;
    for (const auto& line : p.samples)
        for (uint8_t q : line) aSum += q, aSq += (q - 15.5) * (q - 15.5), aCount += 1.0;
    EXPECT_NEAR(aSum / aCount, 15.5, 0.1);
    EXPECT_NEAR(std::sqrt(aSq / aCount), 4.5, 0.5);

    // The truth lists the faults, and targets off the grid of lines and pixels.
    EXPECT_EQ(p.truth["events"]["dropped_pulses"].numbers(), (std::vector<double>{100, 101}));
    EXPECT_EQ(p.truth["events"]["swst_changes"][std::size_t{0}]["window_shift_samples"].number(), 88);
    EXPECT_NEAR(p.truth["events"]["prf_changes"][std::size_t{0}]["prf"].number(), 1.0 / (2802 * 210.94e-9), 1e-9);
    ASSERT_EQ(p.truth["targets"].size(), 4u);
    for (const CJson& t : p.truth["targets"].elements()) {
        const double l = t["expected_line"].number(), px = t["expected_pixel"].number();
        EXPECT_GT(std::min(l - std::floor(l), px - std::floor(px)), 0.1);
        EXPECT_NEAR(t["doppler_centroid"].number(), 290.0, 1e-6);
    }
}

TEST_F(SimOutput, EnvisatAndAlosProductsUseTheirFormatsAndPrefixes)
{
    const std::string e = root("asar");
    const CSimScene se = simulate({"--preset", "envisat", "--lines", "700", "--samples", "1100", "--targets", "grid:1x2",
                                   "--swst-change", "300:-7", "--write-doppler"},
                                  e);
    const Product pe(e);
    EXPECT_STREQ((*pe.header)["RasterInfo.CellType"].getString(), "FLOAT_COMPLEX");
    EXPECT_EQ((*pe.header)["RasterInfo.RowPrefix"].getInteger(), 64);
    EXPECT_FALSE((*pe.header)["ChannelInfo.PRFExtracted"].isInitialised());
    EXPECT_EQ((*pe.header)["Processing.DopCenRangeCoeff"].getDouble(0, 0), 210.0);
    for (int rec : {0, 299, 300, 699}) {
        EXPECT_EQ(pe.be32(rec, 54), static_cast<uint32_t>(se.mCounter0 + rec));
        EXPECT_EQ(pe.be16(rec, 58), se.mSwstCode0 - (rec >= 300 ? 7 : 0));
        EXPECT_EQ(fqorvSimGetBE16(&pe.prefixes[rec][60]), 11624);
    }
    // Decoded 4-bit samples, read back in native order: finite and zero-mean.
    const float* f = reinterpret_cast<const float*>(pe.samples[350].data());
    double aSum = 0.0, aSq = 0.0;
    for (int i = 0; i < 2 * 1100; ++i) aSum += f[i], aSq += f[i] * f[i];
    ASSERT_TRUE(std::isfinite(aSq));
    EXPECT_LT(std::fabs(aSum / 2200.0), 0.2 * std::sqrt(aSq / 2200.0));

    const std::string a = root("palsar");
    const CSimScene sa = simulate({"--preset", "alos", "--lines", "800", "--samples", "1100", "--targets", "grid:1x1",
                                   "--swst-change", "500:5"},
                                  a);
    const Product pa(a);
    EXPECT_STREQ((*pa.header)["Sensor.SensorName"].getString(), "ALOS_PALSAR");
    EXPECT_STREQ((*pa.header)["Sensor.Chirp"].getString(), "DOWN_CHIRP");
    std::string aOrigin;
    ASSERT_TRUE(fqorvGetUserKey(*pa.header, "ORIGIN DATA", aOrigin));
    EXPECT_EQ(aOrigin, "ALOS_PALSAR_FBS10");
    EXPECT_TRUE(pa.header->checkMandatory("raw_input", false));
    const double dr = kC / (2.0 * 32e6);
    const double aNear = pa.num("Processing.SlantRange");
    for (int rec : {0, 499, 500, 799}) {
        EXPECT_EQ(pa.be32(rec, 12), static_cast<uint32_t>(sa.mCounter0 + rec));
        const double aRange = aNear + (rec >= 500 ? 5 * dr : 0.0);
        EXPECT_EQ(static_cast<int32_t>(pa.be32(rec, 116)), std::lround(aRange)) << rec;
    }
}

TEST_F(SimOutput, TruthFileResimulatesItsScene)
{
    const std::string r = root("again");
    const CSimScene s = simulate({"--lines", "900", "--samples", "1000", "--targets", "grid:2x3", "--scatterers", "25",
                                  "--doppler-centroid", "-1900", "--seed", "11", "--drop-lines", "50"},
                                 r);
    const CJson aTruth = CJson::parseFile(r + "_truth.json");
    EXPECT_EQ(aTruth["targets"].size(), 6u);  // scatterers are not listed
    EXPECT_EQ(aTruth["scatterers"]["count"].number(), 25);

    CSimScene t;
    ASSERT_TRUE(fqorvSimApplyPreset(t, "ers2", false));
    fqorvSimApplySceneJson(t, aTruth);
    fqorvSimCompleteScene(t);
    EXPECT_EQ(t.mStartTime, s.mStartTime);
    EXPECT_EQ(t.mTauFirst, s.mTauFirst);
    EXPECT_EQ(t.mSwstCode0, s.mSwstCode0);
    EXPECT_EQ(t.mFaults.mDroppedPulses, s.mFaults.mDroppedPulses);
    ASSERT_EQ(t.mTargets.size(), s.mTargets.size());
    for (std::size_t i = 0; i < s.mTargets.size(); ++i) {
        EXPECT_LT((t.mTargets[i].mEcef - s.mTargets[i].mEcef).norm(), 1e-6) << i;
        EXPECT_NEAR(t.mTargets[i].mAmplitude, s.mTargets[i].mAmplitude, 1e-12);
    }
    // The same orbit: its state at the middle of the scene within a micrometre.
    const double tm = s.mStartTime + 450.0 / s.mRadar.mPrf;
    EXPECT_LT((fqorvSimMakeOrbit(t)->state(tm).mPos - fqorvSimMakeOrbit(s)->state(tm).mPos).norm(), 1e-6);
}

TEST(SimTool, CommandLineExitsCleanlyOnHelpAndBadOptionsAndWritesAProduct)
{
    qtest::TempDir aDir("qorvex-sim");
    qtest::writeConfiguration(aDir / "etc", aDir / "work");
    const fs::path aTool = qtest::binaryDir() / "qorvex_simulate";
    auto run = [&](const std::vector<std::string>& theArgs) {
        return qtest::runProgram(aTool, theArgs, {}, aDir.path(), 120);
    };
    qtest::RunResult r = run({"--help"});
    EXPECT_EQ(r.mStatus, 0);
    EXPECT_NE(r.mStdout.find("--drop-lines"), std::string::npos);

    // A scene file of 50 KB of nested brackets is refused, not followed down to a stack overflow.
    qtest::writeFile(aDir / "deep.json", std::string(50000, '['));
    qtest::writeFile(aDir / "escape.json", "{\"a\": \"\\u+fff\"}");
    const std::vector<std::pair<std::vector<std::string>, std::string>> aBad = {
        {{"--lines", "ten"}, "--lines: \"ten\" is not a whole number"},
        {{"--prf-change", "5"}, ""},
        {{"--config", (aDir / "nowhere").string(), "--lines", "600", "--samples", "900"}, "Qorvex_configuration.ini"},
        {{"--scene", (aDir / "deep.json").string()}, "nesting deeper than 200 levels"},
        {{"--scene", (aDir / "escape.json").string()}, "bad unicode escape"},
    };
    for (const auto& [aArgs, aWords] : aBad) {
        r = run(aArgs);
        EXPECT_EQ(r.mStatus, 2) << aArgs[0];
        EXPECT_NE(r.mStderr.find(aWords), std::string::npos) << r.mStderr;
    }

    const std::string aRoot = (aDir / "tool_raw").string();
    r = run({"--config", (aDir / "etc").string(), "--out", aRoot, "--lines", "600", "--samples", "900", "--targets",
             "grid:1x1", "--quiet"});
    EXPECT_EQ(r.mStatus, 0) << r.mStderr;
    EXPECT_TRUE(fs::exists(aRoot + ".sml"));
    EXPECT_TRUE(fs::exists(aRoot + "_truth.json"));
    EXPECT_EQ(fs::file_size(aRoot), 600u * (412u + 2u * 900u));
}

}  // namespace
