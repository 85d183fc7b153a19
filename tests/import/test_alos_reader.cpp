// The ALOS PALSAR level 1.0 reader against products the simulator writes: the values of the leader
// and the image file, the codes of every record, one product per polarisation, and the refusals.
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "qorv_import_failure.h"
#include "qorv_json.h"
#include "qorv_line_plan.h"
#include "qorv_native_reader.h"
#include "qorv_sim_alos.h"
#include "qorv_sim_options.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_writer.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;
constexpr double kLight = 299792458.0;

std::pair<int, std::string> failureOf(const std::function<void()>& theRead)
{
    try {
        theRead();
    } catch (const CImportFailure& aFailure) {
        return {aFailure.id(), aFailure.parameter()};
    }
    return {0, ""};
}

/// Overwrites the bytes at theAt of theFile.
void patch(const fs::path& theFile, std::streamoff theAt, const std::string& theBytes)
{
    std::fstream f(theFile, std::ios::in | std::ios::out | std::ios::binary);
    f.seekp(theAt);
    f.write(theBytes.data(), static_cast<std::streamsize>(theBytes.size()));
}
/// ... with theValue, big-endian.
void patchU32(const fs::path& theFile, std::streamoff theAt, uint32_t theValue)
{
    patch(theFile, theAt, {static_cast<char>(theValue >> 24), static_cast<char>(theValue >> 16), static_cast<char>(theValue >> 8),
                           static_cast<char>(theValue)});
}

/// An FBS product of theLines lines written straight from plain values: line k has the line
/// number 7 + k, the time 3600 s + k / PRF, the slant range 850000 m.
fs::path writeProduct(const fs::path& theDirectory, const CSimAlosProduct& theProduct, int theLines = 40)
{
    CSimAlosWriter aWriter(theProduct, theDirectory);
    std::vector<uint8_t> aSamples(2 * static_cast<std::size_t>(theProduct.mSamples), 15);
    for (int k = 0; k < theLines; ++k)
        aWriter.writeLine({static_cast<uint32_t>(7 + k), 3600.0 + k / theProduct.mPrf, 2159765, 850000}, aSamples.data());
    return aWriter.finish();
}

CSimAlosProduct fbsProduct()
{
    CSimAlosProduct p;
    p.mSceneId = "ALPSRP123451230-H1.0__A";
    p.mReferenceDay = 13574;   // 2007-03-02
    p.mSamples = 64;
    p.mOrbit = 12345;
    p.mWavelength = kLight / 1.27e9;
    p.mSamplingRate = 32e6;
    p.mPulseLength = 27e-6;
    p.mBandwidth = 28e6;
    p.mPrf = 2159.765;
    p.mCentreTime = 3600.5;
    p.mCentreLatitude = 35.68;
    p.mCentreLongitude = 139.2;
    p.mIncidenceDeg = 38.7;
    for (int i = 0; i < 5; ++i) p.mStateVectors.push_back({3480.0 + 60.0 * i, {7.0e6, 1.0e5 * i, 0.0}, {0.0, 0.0, 7500.0}});
    return p;
}

}  // namespace

TEST(AlosReader, SimulatedFbdSceneReadsBackAsTwoProductsWithEveryLineCode)
{
    qtest::TempDir aTemp;
    const std::string aRoot = (aTemp / "scene").string();
    CSimScene aScene;
    CSimCommand aCommand;
    fqorvSimParseCommandLine({"--preset", "alos-fbd", "--format", "alos", "--lines", "1200", "--no-noise", "--drop-lines", "100",
                              "--repeat-line", "200", "--swst-change", "500:10", "--prf-change", "700:2200"},
                             aScene, aCommand);
    fqorvSimCompleteScene(aScene);
    fqorvSimRun(aScene, aRoot);
    const CSimTimeline aTimeline(aScene);
    const CJson aTruth = CJson::parseFile(aRoot + "_truth.json");

    const std::vector<CNativeArchive> aArchives = fqorvReadNativeArchives(aRoot);
    ASSERT_EQ(aArchives.size(), 2u);
    EXPECT_EQ(aArchives[0].mPolarisation, "HH");
    EXPECT_EQ(aArchives[1].mPolarisation, "HV");
    const CNativeArchive& a = aArchives[0];
    EXPECT_EQ(a.mSensor, "ALOS_PALSAR");
    EXPECT_EQ(a.mFamily, ENativeFamily::Alos);
    EXPECT_EQ(a.mOriginData, "ALOS_PALSAR_FBD10");
    EXPECT_DOUBLE_EQ(a.mSamplingRate, 16e6);
    EXPECT_DOUBLE_EQ(a.mBandwidth, 14e6);
    EXPECT_DOUBLE_EQ(a.mChirpRate, -14e6 / 27e-6);
    EXPECT_NEAR(a.mCarrier, 1.27e9, 1.0);
    EXPECT_NEAR(a.mPrf, aTimeline.prf(0), 1e-9);
    EXPECT_EQ(a.mPrfSwitchLine, aTruth["archive"]["prf_switch_line"].number());
    EXPECT_EQ(a.mLayout.mSamples, aScene.mSamples);
    EXPECT_EQ(a.mLayout.mSuffix, 80u);
    EXPECT_EQ(a.mLayout.mRecords, 1200u);
    EXPECT_EQ(a.mReferenceDay, aScene.mEpoch.mDay);
    EXPECT_NEAR(a.mCentreTime - aScene.mEpoch.mSeconds, aTruth["scene_centre"]["zero_doppler_time"].number(), 1e-3);
    EXPECT_GE(a.mStateVectors.size(), 5u);
    EXPECT_EQ(a.mStateVectors[1].mTime - a.mStateVectors[0].mTime, 60.0);

    // Every record's codes: the line numbers (a gap, a repeat), the time truncated to the ms, the
    // PRF that switches, the window that moves by 10 samples.
    CNativeRecordFile aFile(a.mLayout);
    const std::vector<CRecordCodes> aCodes = aFile.scan();
    ASSERT_EQ(aCodes.size(), aTimeline.records().size());
    for (std::size_t i = 0; i < aCodes.size(); ++i) {
        const CSimRecord& r = aTimeline.records()[i];
        SCOPED_TRACE(i);
        ASSERT_EQ(aCodes[i].mCounter, r.mCounter);
        const double t = a.mClock.timeOf(aCodes[i].mClock) - aScene.mEpoch.mSeconds - aTimeline.pulseTime(r.mPulse);
        ASSERT_TRUE(t <= 1e-9 && t > -1e-3) << t;
        ASSERT_EQ(aCodes[i].mPrfMilliHz, static_cast<uint32_t>(std::llround(aTimeline.prf(r.mPulse) * 1000.0)));
        ASSERT_EQ(aCodes[i].mRange, std::lround(0.5 * kLight * aTimeline.windowDelay(r.mPulse)));
    }
    EXPECT_EQ(aCodes[100].mCounter, aCodes[99].mCounter + 2);
    EXPECT_EQ(aCodes[200].mCounter, aCodes[199].mCounter);
    EXPECT_NE(aCodes[800].mPrfMilliHz, aCodes[0].mPrfMilliHz);
    EXPECT_NEAR(aCodes[800].mRange - aCodes[0].mRange, 10 * kLight / (2 * 16e6), 0.5);

    // One product at a time: the directory holds two, an image file names one.
    EXPECT_EQ(failureOf([&] { fqorvReadNativeArchive(aRoot); }).first, 979201);
    const fs::path aHv = aArchives[1].mLayout.mDataFile;
    EXPECT_EQ(fqorvReadNativeArchive(aHv).mPolarisation, "HV");
    EXPECT_EQ(fqorvReadNativeArchives(aHv).size(), 1u);
}

TEST(AlosReader, FbsValuesAndRefusals)
{
    qtest::TempDir aTemp;
    const fs::path aGood = writeProduct(aTemp / "good", fbsProduct());
    const CNativeArchive a = fqorvReadNativeArchive(aGood / "LED-ALPSRP123451230-H1.0__A");
    EXPECT_EQ(a.mOriginData, "ALOS_PALSAR_FBS10");
    EXPECT_EQ(a.mProductName, "ALPSRP123451230-H1.0__A");
    EXPECT_EQ(a.mOrbit, 12345);
    EXPECT_DOUBLE_EQ(a.mChirpRate, -28e6 / 27e-6);
    EXPECT_DOUBLE_EQ(a.mCentreLongitude, 139.2);
    EXPECT_EQ(a.mLayout.mFirstRecord, 720u);
    EXPECT_EQ(a.mLayout.mRecordLength, 412u + 2 * (64 + 40));
    EXPECT_EQ(a.mLayout.mCounterPos, 12);
    EXPECT_EQ(a.mClock.timeOf(CNativeRecordFile(a.mLayout).scan()[3].mClock), std::floor((3600.0 + 3 / 2159.765) * 1000) / 1000);

    struct CCase {
        const char* mName;
        std::function<void(CSimAlosProduct&)> mValues;
        std::function<void(const fs::path&)> mEdit;   // of the written directory
        int mId;
        const char* mWords;
    };
    const auto image = [](const fs::path& d) { return d / "IMG-HH-ALPSRP123451230-H1.0__A"; };
    const auto none = [](const fs::path&) {};
    const CCase aCases[] = {
        {"image without leader", [](CSimAlosProduct&) {}, [](const fs::path& d) { fs::remove(d / "LED-ALPSRP123451230-H1.0__A"); },
         979202, "no ALOS leader beside"},
        {"record length changes", [](CSimAlosProduct&) {}, [&](const fs::path& d) { patchU32(image(d), 720 + 5 * 620 + 8, 600); },
         979203, "record 6 at byte 3820 states a length of 600"},
        {"descriptor's pixels", [](CSimAlosProduct&) {}, [&](const fs::path& d) { patch(image(d), 248, "      65"); }, 979203,
         "65 pixels per line, the first record 64"},
        {"polarimetric by PRF", [](CSimAlosProduct& p) { p.mPrf = 4320.0; }, none, 979201, "polarimetric ALOS products are not imported"},
        {"polarimetric by name", [](CSimAlosProduct& p) { p.mSensorText = "ALOS-PALSAR-PLR"; }, none, 979201, "polarimetric"},
        {"velocities in mm/s", [](CSimAlosProduct& p) { for (CStateVector& v : p.mStateVectors) v.mVelocity[2] *= 1000.0; }, none,
         979210, "not m/s"},
        {"neither FBS nor FBD", [](CSimAlosProduct& p) { p.mSamplingRate = 20e6; }, none, 979210, "neither FBS"},
    };
    for (const CCase& aCase : aCases) {
        SCOPED_TRACE(aCase.mName);
        CSimAlosProduct p = fbsProduct();
        aCase.mValues(p);
        const fs::path aDir = writeProduct(aTemp / aCase.mName, p);
        aCase.mEdit(aDir);
        const auto [aId, aWords] = failureOf([&] {
            const CNativeArchive x = fqorvReadNativeArchive(image(aDir));
            CNativeRecordFile(x.mLayout).scan();
        });
        EXPECT_EQ(aId, aCase.mId) << aWords;
        EXPECT_NE(aWords.find(aCase.mWords), std::string::npos) << aWords;
    }
}

TEST(AlosReader, RecordsOfImpossibleDatesAreClockReadingsLeftOut)
{
    // A year far out of range once overflowed the record's millisecond count (the sanitizer suite
    // tells); such a reading is left out like any corrupt one (fewer than one in a hundred).
    qtest::TempDir aTemp;
    const fs::path aImage = writeProduct(aTemp / "p", fbsProduct(), 240) / "IMG-HH-ALPSRP123451230-H1.0__A";
    const auto plan = [&] {
        const CNativeArchive a = fqorvReadNativeArchive(aImage);
        return fqorvPlanLines(CNativeRecordFile(a.mLayout).scan(), a);
    };
    const CLinePlan aGood = plan();
    patchU32(aImage, 720 + 5 * 620 + 36, 0x7FFFFFFFu);   // the years of records 5 and 90
    patchU32(aImage, 720 + 90 * 620 + 36, 0x80000000u);
    const CLinePlan aPatched = plan();
    ASSERT_EQ(aPatched.mProducts.size(), 1u);
    EXPECT_EQ(aPatched.mProducts[0].mLines.size(), aGood.mProducts[0].mLines.size());
    EXPECT_EQ(aPatched.mProducts[0].mFirstPulseTime, aGood.mProducts[0].mFirstPulseTime);
}
