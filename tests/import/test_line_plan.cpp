// The line plan of an import: record codes in, products out, each product read back the way the
// chain's line continuity reads its prefixes.
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "qorv_errors.h"
#include "qorv_import_failure.h"
#include "qorv_line_plan.h"

namespace {

using CEdit = std::function<void(std::vector<CRecordCodes>&)>;

constexpr int kPri = 2820;
constexpr int kSwst = 878;
const double kPrf = 1.0 / ((kPri + 2) * 210.94e-9);
constexpr double kT0 = 51234.5678901;   // s of day of pulse 0

/// One record per pulse index: counter from theBase (a stray high byte above its 24 bits), the
/// clock latched every fourth pulse in 1/256 s ticks (tick 0 at 0 s), PRI 2820, SWST 878.
std::vector<CRecordCodes> fRecords(const std::vector<int64_t>& thePulses, uint32_t theBase = 1000)
{
    std::vector<CRecordCodes> aCodes;
    for (int64_t k : thePulses) {
        const double aLatch = kT0 + static_cast<double>(k / 4 * 4) / kPrf;
        aCodes.push_back({static_cast<uint32_t>((theBase + k) & 0xFFFFFF) | 0xAB000000u,
                          static_cast<uint32_t>(std::floor(aLatch * 256.0)), kSwst, kPri, true});
    }
    return aCodes;
}

/// thePulses followed by [theFirst, theEnd).
std::vector<int64_t> fPulses(int64_t theFirst, int64_t theEnd, std::vector<int64_t> thePulses = {})
{
    for (int64_t k = theFirst; k < theEnd; ++k) thePulses.push_back(k);
    return thePulses;
}

CNativeArchive fArchive(double theCentre = NAN, double theStart = NAN)
{
    CNativeArchive a;
    a.mClock.mReferenceTime = 0.0;   // tick 0 at 0 s
    a.mCentreTime = theCentre;
    a.mSensingStart = theStart;
    return a;
}

/// Reads a product as the chain does, written apart from the plan: a counter that does not grow
/// is dropped, steps up to 31 are followed. False on a first counter other than 1, a longer step,
/// a SWST off the 22-code steps from the first line's, a PRI other than the product's, or lines
/// formed other than the pulses the product states.
bool fChainFollows(const CPlannedProduct& p)
{
    int64_t aLast = 0;
    for (const CPlannedLine& l : p.mLines) {
        const int64_t aStep = static_cast<int32_t>(l.mCounter) - aLast;
        if ((aLast == 0 && l.mCounter != 1) || aStep > 31) return false;
        if ((l.mSwst - p.mFirstSwst) % 22 != 0 || l.mPri != p.mPriCode) return false;
        if (aStep >= 1) aLast = l.mCounter;
    }
    return p.mLines.front().mSwst == p.mFirstSwst && aLast == p.mPulses;
}

CLinePlan fPlan(const std::vector<CRecordCodes>& theCodes, const CNativeArchive& theArchive = fArchive())
{
    const CLinePlan aPlan = fqorvPlanLines(theCodes, theArchive);
    for (const CPlannedProduct& p : aPlan.mProducts) EXPECT_TRUE(fChainFollows(p)) << "from record " << p.mFirstRecord;
    return aPlan;
}

/// True when a note of the plan or its products holds theWords.
bool fNoted(const CLinePlan& thePlan, const std::string& theWords)
{
    std::string aAll;
    for (const std::string& n : thePlan.mNotes) aAll += n + "\n";
    for (const CPlannedProduct& p : thePlan.mProducts)
        for (const std::string& n : p.mNotes) aAll += n + "\n";
    return aAll.find(theWords) != std::string::npos || (ADD_FAILURE() << aAll, false);
}

int64_t fFillLines(const CPlannedProduct& p)
{
    return std::count_if(p.mLines.begin(), p.mLines.end(), [](const CPlannedLine& l) { return l.mSource < 0; });
}

/// The words of the CImportFailure theRun throws, after checking its id.
std::string fFailure(int theId, const std::function<void()>& theRun)
{
    try {
        theRun();
    } catch (const CImportFailure& e) {
        EXPECT_EQ(e.id(), theId) << e.parameter();
        return e.parameter();
    }
    ADD_FAILURE() << "no failure " << theId;
    return "";
}

TEST(LinePlan, CountersGapsAndRepeatsLeaveTheChainOnlyWhatItHandles)
{
    struct CCase {
        const char* mName;
        std::vector<int64_t> mPulses;
        CEdit mEdit;
        size_t mProducts;
        int64_t mRecordLines, mFills, mSpanned;   // of the first product
        const char* mNote;
        uint32_t mBase = 1000;                    // of the counters
    };
    const std::vector<int64_t> aClean = fPulses(0, 600);
    const CCase aCases[] = {
        {"a gap of 30 left to the chain", fPulses(330, 630, fPulses(0, 300)), {}, 1, 600, 0, 630, ""},
        {"a gap of 31 filled", fPulses(331, 631, fPulses(0, 300)), {}, 1, 600, 31, 631, "31 lines filled for 1 gap"},
        {"a gap of 4097 splits", fPulses(4397, 4697, fPulses(0, 300)), {}, 2, 300, 0, 300, "jumps further"},
        {"a jump far back splits", fPulses(-9000, -8700, fPulses(0, 300)), {}, 2, 300, 0, 300, "jumps further"},
        {"a wrap", aClean, {}, 1, 600, 0, 600, "wraps at record 256;", 0xFFFF00},
        {"a repeat and an overlap left", fPulses(300, 600, fPulses(290, 300, fPulses(0, 300))), {}, 1, 610, 0, 600,
         "10 records repeat"},
        {"a garbled counter", aClean, [](auto& c) { c[200].mCounter = 0x123456; }, 1, 600, 0, 600,
         "1 line counter fits neither the record before nor the one after (record 200)"},
        {"a first counter that leads nowhere", aClean, [](auto& c) { c[0].mCounter = 1100; }, 1, 599, 0, 599,
         "1 record is left out"},
        {"a record without its marker", aClean, [](auto& c) { c[250] = {0x42, 0, 3, 7, false}; }, 1, 600, 0, 600,
         "1 record lacks the 0xAA marker"},
        {"a short product left out", fPulses(9000, 9020, fPulses(0, 300)), {}, 1, 300, 0, 300, "shorter than 32"},
    };
    for (const CCase& c : aCases) {
        SCOPED_TRACE(c.mName);
        std::vector<CRecordCodes> aCodes = fRecords(c.mPulses, c.mBase);
        if (c.mEdit) c.mEdit(aCodes);
        const CLinePlan aPlan = fPlan(aCodes);
        ASSERT_EQ(aPlan.mProducts.size(), c.mProducts);
        const CPlannedProduct& p = aPlan.mProducts.front();
        EXPECT_EQ(fFillLines(p), c.mFills);
        EXPECT_EQ(static_cast<int64_t>(p.mLines.size()), c.mRecordLines + c.mFills);
        EXPECT_EQ(p.mPulses, c.mSpanned);
        EXPECT_TRUE(fNoted(aPlan, c.mNote));
        // Each record's line counts its pulses from the product's first; untrusted codes never reach a line.
        for (const CPlannedLine& l : p.mLines) {
            if (l.mSource < 0) continue;
            EXPECT_EQ(l.mCounter, c.mPulses[l.mSource] - c.mPulses[p.mFirstRecord] + 1) << "record " << l.mSource;
            EXPECT_EQ(l.mSwst, kSwst);
            EXPECT_EQ(l.mPri, kPri);
        }
    }
    fFailure(CQORV_ERR_IMPORT_NO_LINES, [] { fqorvPlanLines(fRecords(fPulses(0, 31)), fArchive()); });
}

TEST(LinePlan, PriAndSwstCodesHoldOrGiveWay)
{
    auto aSet = [](int theFrom, int theTo, uint16_t CRecordCodes::*theCode, int theValue) -> CEdit {
        return [=](std::vector<CRecordCodes>& c) {
            for (int i = theFrom; i < theTo; ++i) c[i].*theCode = static_cast<uint16_t>(theValue);
        };
    };
    const auto aPri = &CRecordCodes::mPri;
    const auto aSwst = &CRecordCodes::mSwst;
    struct CCase {
        const char* mName;
        CEdit mEdit;
        size_t mProducts;
        int mLastPri, mLastSwst;   // of the last line of the last product
        const char* mNote;
    } aCases[] = {
        {"a PRI change splits", aSet(300, 600, aPri, 2822), 2, 2822, kSwst, "2820 (1679.902 Hz) to 2822"},
        {"a PRI code held for 7 records", aSet(300, 307, aPri, 2822), 1, kPri, kSwst, "7 records have a PRI code"},
        {"a PRI code out of band", aSet(300, 600, aPri, 100), 1, kPri, kSwst, "300 records have a PRI code"},
        {"a window step of 22 kept", aSet(300, 600, aSwst, kSwst + 22), 1, kPri, kSwst + 22,
         "moves by +22 codes (+88 samples) at record 300"},
        {"a window step of 23", aSet(300, 600, aSwst, kSwst + 23), 1, kPri, kSwst, "300 records have a window code"},
        {"a window step held for 7 records", aSet(300, 307, aSwst, kSwst + 22), 1, kPri, kSwst, "7 records have a"},
        {"a window code below 500", aSet(300, 600, aSwst, kSwst - 19 * 22), 1, kPri, kSwst, "300 records have a"},
        {"leading window codes", aSet(0, 5, aSwst, 0), 1, kPri, kSwst, "records 0 to 4 come before"},
        {"a window step 5 records before a product ends",
         [&](auto& c) { aSet(300, 600, aPri, 2822)(c); aSet(295, 600, aSwst, kSwst + 22)(c); }, 2, 2822, kSwst + 22,
         "5 records have a window"},
    };
    for (const CCase& c : aCases) {
        SCOPED_TRACE(c.mName);
        std::vector<CRecordCodes> aCodes = fRecords(fPulses(0, 600));
        c.mEdit(aCodes);
        const CLinePlan aPlan = fPlan(aCodes);
        ASSERT_EQ(aPlan.mProducts.size(), c.mProducts);
        EXPECT_EQ(aPlan.mProducts.back().mLines.back().mPri, c.mLastPri);
        EXPECT_EQ(aPlan.mProducts.back().mLines.back().mSwst, c.mLastSwst);
        EXPECT_TRUE(fNoted(aPlan, c.mNote));
    }
    for (auto [aCode, aValue, aWords] : {std::tuple{aPri, 100, "PRI code 100"}, {aSwst, 1501, "SWST code 1501"}}) {
        std::vector<CRecordCodes> aCodes = fRecords(fPulses(0, 600));
        aSet(0, 600, aCode, aValue)(aCodes);
        EXPECT_NE(fFailure(CQORV_ERR_IMPORT_CODE_RANGE, [&] { fPlan(aCodes); }).find(aWords), std::string::npos);
    }
}

TEST(LinePlan, AFullFrameIsPlannedInMillisecondsAndTimedWithinMicroseconds)
{
    // 28,000 records: lost lines, gaps of 40, repeats, garbled codes, corrupt clock readings and a
    // jump of 5000 lines that starts a second product at pulse 19000. Each product is timed from
    // its own first pulse, within 5 us from thousands of latches of a 3906 us tick.
    std::vector<int64_t> aPulses;
    for (int64_t k = 40; aPulses.size() < 28000; ++k) {
        if (k % 997 == 996) continue;
        aPulses.push_back(k < 14000 ? k + k / 3001 * 40 : k + 5000);
        if (k % 5003 == 5002) aPulses.push_back(aPulses.back());
    }
    std::vector<CRecordCodes> aCodes = fRecords(aPulses);
    for (size_t i = 123; i < aCodes.size(); i += 1009) aCodes[i].mSwst = aCodes[i].mPri = 4000;
    for (int i : {17, 900, 2222, 3001, 20000}) aCodes[i].mClock += (i % 2 ? 3000 : -3000);
    const auto aStart = std::chrono::steady_clock::now();
    const CLinePlan aPlan = fPlan(aCodes);
    const double aMs = std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - aStart).count();
    std::printf("28000 records planned and read back in %.2f ms\n", aMs);
    EXPECT_LT(aMs, 250.0);   // loose: a pass quadratic in the records would take seconds
    ASSERT_EQ(aPlan.mProducts.size(), 2u);
    EXPECT_NEAR(aPlan.mProducts[0].mFirstPulseTime, kT0 + 40 / kPrf, 5e-6);
    EXPECT_NEAR(aPlan.mProducts[1].mFirstPulseTime, kT0 + 19000 / kPrf, 5e-6);
    EXPECT_EQ(aPlan.mProducts[0].mTimeSource, "on-board clock");
    EXPECT_TRUE(fNoted(aPlan, "4 clock readings of 13"));

    // A scene time more than a second off the clock takes over, with a warning; one within does not.
    std::vector<CRecordCodes> aOne = fRecords(fPulses(0, 3000));
    CLinePlan aScene = fPlan(aOne, fArchive(kT0 + 1499.5 / kPrf + 1.5));
    EXPECT_NEAR(aScene.mProducts[0].mFirstPulseTime, kT0 + 1.5, 1e-9);
    EXPECT_EQ(aScene.mProducts[0].mTimeSource, "scene centre time");
    EXPECT_EQ(aScene.mWarnings.size(), 1u);
    aScene = fPlan(aOne, fArchive(NAN, kT0 + 0.5));
    EXPECT_TRUE(aScene.mWarnings.empty());
    EXPECT_NEAR(aScene.mProducts[0].mFirstPulseTime, kT0, 5e-6);

    // A clock that falls back by 10 s at record 2000.
    for (size_t i = 2000; i < aOne.size(); ++i) aOne[i].mClock -= 2560;
    const std::string aFalls = "record 2000: the on-board clock falls from " + std::to_string(aOne[1999].mClock);
    EXPECT_NE(fFailure(CQORV_ERR_IMPORT_TIME_ORDER, [&] { fPlan(aOne); }).find(aFalls), std::string::npos);
}

TEST(LinePlan, CutRenumbersFromTheFirstLineTheChainKeeps)
{
    // Records 0..299: pulses 0..299; 300..309: 340..349 after 40 fill lines; 310..319: a repeat of
    // 290..299; 320..610: 350..640.
    const CLinePlan aPlan = fPlan(fRecords(fPulses(350, 641, fPulses(290, 300, fPulses(340, 350, fPulses(0, 300))))));
    ASSERT_EQ(aPlan.mProducts.size(), 1u);
    struct CCase {
        int64_t mFirst, mCount, mFirstRecord, mLastRecord, mPulses, mFirstPulse;
    };
    for (const CCase& c : {CCase{250, 100, 250, 349, 130, 250}, CCase{300, 10, 300, 309, 10, 340},
                           CCase{312, 20, 320, 331, 12, 350}, CCase{600, 1000, 600, 610, 11, 630}}) {
        SCOPED_TRACE(c.mFirst);
        const CLinePlan aCut = fqorvCutPlan(aPlan, c.mFirst, c.mCount);
        ASSERT_EQ(aCut.mProducts.size(), 1u);
        const CPlannedProduct& p = aCut.mProducts.front();
        EXPECT_TRUE(fChainFollows(p));
        EXPECT_EQ(p.mFirstRecord, c.mFirstRecord);
        EXPECT_EQ(p.mLastRecord, c.mLastRecord);
        EXPECT_EQ(p.mPulses, c.mPulses);
        EXPECT_NEAR(p.mFirstPulseTime, aPlan.mProducts[0].mFirstPulseTime + c.mFirstPulse / kPrf, 1e-9);
    }
    fFailure(CQORV_ERR_IMPORT_OPTION, [&] { fqorvCutPlan(aPlan, 611, 10); });
    fFailure(CQORV_ERR_IMPORT_OPTION, [&] { fqorvCutPlan(aPlan, 312, 8); });   // repeats only
}

// ------------------------------------------------------------------------------------------------
// ASAR and ALOS

constexpr double kAsarFs = 19.20768e6;
constexpr int kAsarPri = 11028;
constexpr int kAsarSwst = 1232;
constexpr uint32_t kAlosPrf = 2159827;   // mHz

/// One ASAR packet per pulse index, echoes unless listed in theNoise: the mode packet count from
/// 5000, the sensing time in us (truncated), packets of 68 + 6762 bytes back to back (6656
/// samples; every tenth one block shorter).
std::vector<CRecordCodes> fAsarPackets(int theCount, const std::vector<int>& theNoise = {})
{
    std::vector<CRecordCodes> aCodes;
    uint64_t aOffset = 3203;
    for (int k = 0; k < theCount; ++k) {
        CRecordCodes c;
        c.mMarker = true;
        c.mCounter = 5000u + static_cast<uint32_t>(k);
        c.mClock = static_cast<int64_t>(std::floor((kT0 + k * kAsarPri / kAsarFs) * 1e6));
        c.mSwst = kAsarSwst;
        c.mPri = kAsarPri;
        c.mEcho = std::find(theNoise.begin(), theNoise.end(), k) == theNoise.end();
        c.mOffset = aOffset;
        c.mLength = 68 + (k % 10 == 9 ? 6762 - 64 : 6762);
        aOffset += c.mLength;
        aCodes.push_back(c);
    }
    return aCodes;
}

CNativeArchive fFamilyArchive(ENativeFamily theFamily, int64_t theSwitchLine = -1)
{
    CNativeArchive a = fArchive();
    a.mFamily = a.mLayout.mFamily = theFamily;
    a.mClock.mWraps32 = false;
    a.mClock.mLatchPulses = 0;
    a.mClock.mTickSeconds = theFamily == ENativeFamily::Asar ? 1e-6 : 1e-3;
    a.mSamplingRate = kAsarFs;
    a.mLayout.mSamplesPos = theFamily == ENativeFamily::Asar ? 68 : 412;
    a.mLayout.mSamples = 5000;
    a.mPrfSwitchLine = theSwitchLine;
    return a;
}

/// One ALOS record per line number in theLines: PRF 2159.827 Hz, slant range 850 km, the time of
/// day in whole ms.
std::vector<CRecordCodes> fAlosRecords(const std::vector<int64_t>& theLines)
{
    std::vector<CRecordCodes> aCodes;
    for (int64_t n : theLines) {
        CRecordCodes c;
        c.mMarker = true;
        c.mCounter = static_cast<uint32_t>(n);
        c.mClock = static_cast<int64_t>(std::floor((kT0 + (n - 1) / (kAlosPrf * 1e-3)) * 1e3));
        c.mPrfMilliHz = kAlosPrf;
        c.mRange = 850000;
        aCodes.push_back(c);
    }
    return aCodes;
}

TEST(LinePlan, AsarPacketsStayOnThePulseGrid)
{
    struct CCase {
        const char* mName;
        std::vector<int> mNoise;
        CEdit mEdit;
        size_t mProducts;
        int64_t mLines, mFills;      // of the first product
        int mLastSwst;               // of the last line of the last product
        const char* mNote;
    };
    std::vector<int> aBurst = {3, 100};
    for (int k = 200; k < 240; ++k) aBurst.push_back(k);
    auto aFrom = [](int theFirst, auto theEdit) -> CEdit {
        return [=](std::vector<CRecordCodes>& c) {
            for (size_t i = theFirst; i < c.size(); ++i) theEdit(c[i]);
        };
    };
    const CCase aCases[] = {
        {"noise packets left out and their pulses kept", aBurst, {}, 1, 598, 40, kAsarSwst,
         "42 packets are no echo (noise or calibration) and left out (records 3, 100, 200, 201 and 38 more)"},
        {"a PRI change splits", {}, aFrom(300, [](CRecordCodes& c) { c.mPri = kAsarPri + 12; }), 2, 300, 0, kAsarSwst,
         "11028 (1741.719 Hz) to 11040 (1739.826 Hz) at record 300"},
        {"any SWST step left to the chain", {}, aFrom(300, [](CRecordCodes& c) { c.mSwst = kAsarSwst + 37; }), 1, 600, 0,
         kAsarSwst + 37, "moves by +37 samples at record 300"},
        {"a SWST beyond the pulse interval is garbage", {}, aFrom(300, [](CRecordCodes& c) { c.mSwst = kAsarPri; }), 1, 600,
         0, kAsarSwst, "300 records have a window code outside 1 .. 11027 samples"},
    };
    for (const CCase& c : aCases) {
        SCOPED_TRACE(c.mName);
        std::vector<CRecordCodes> aCodes = fAsarPackets(600, c.mNoise);
        if (c.mEdit) c.mEdit(aCodes);
        const CLinePlan aPlan = fqorvPlanLines(aCodes, fFamilyArchive(ENativeFamily::Asar));
        ASSERT_EQ(aPlan.mProducts.size(), c.mProducts);
        const CPlannedProduct& p = aPlan.mProducts.front();
        EXPECT_EQ(static_cast<int64_t>(p.mLines.size()), c.mLines);
        EXPECT_EQ(fFillLines(p), c.mFills);
        EXPECT_EQ(aPlan.mProducts.back().mLines.back().mSwst, c.mLastSwst);
        EXPECT_TRUE(fNoted(aPlan, c.mNote));
        for (const std::string& n : p.mNotes) EXPECT_EQ(n.find("lost"), std::string::npos) << n;   // they lose no line
        EXPECT_NEAR(p.mPrf, kAsarFs / kAsarPri, 1e-9);
        EXPECT_EQ(p.mSamples, 6656);
        EXPECT_NEAR(p.mFirstPulseTime, kT0, 2e-6);
        for (const CPlannedLine& l : p.mLines) {
            if (l.mSource < 0) continue;
            // Each echo's line stands at its own pulse and knows where its packet lies.
            EXPECT_EQ(l.mCounter, aCodes[l.mSource].mCounter - aCodes[p.mFirstRecord].mCounter + 1);
            EXPECT_TRUE(aCodes[l.mSource].mEcho);
            EXPECT_EQ(l.mOffset, aCodes[l.mSource].mOffset);
            EXPECT_EQ(l.mSamples, l.mLength == 68 + 6762 ? 6656u : 6656u - 63u);
            EXPECT_EQ(l.mPri, p.mPriCode);
        }
    }
}

TEST(LinePlan, AlosRecordsRepeatsDroppedAndPrfSwitchesChecked)
{
    // Line numbers 1..300, a repeat of 291..300, 301..600.
    const std::vector<int64_t> aRepeat = fPulses(301, 601, fPulses(291, 301, fPulses(1, 301)));
    auto aSwitchAt = [](size_t theRecord) -> CEdit {
        // The records from theRecord on at 1915.709 Hz, their times too.
        return [=](std::vector<CRecordCodes>& c) {
            const double aSwitch = kT0 + theRecord / (kAlosPrf * 1e-3);
            for (size_t i = theRecord; i < c.size(); ++i) {
                c[i].mPrfMilliHz = 1915709;
                c[i].mClock = static_cast<int64_t>(std::floor((aSwitch + (i - theRecord) / 1915.709) * 1e3));
            }
        };
    };
    struct CCase {
        const char* mName;
        std::vector<int64_t> mLines;
        CEdit mEdit;
        int64_t mLeaderSwitch;
        size_t mProducts;
        int64_t mLines0, mFills0;
        const char* mNote;
        int32_t mRangeStep = 0;   // from record 250 on
    };
    const CCase aCases[] = {
        {"a repeat dropped", aRepeat, {}, -1, 1, 600, 0, "10 records repeat or go back to earlier line numbers (records 300,"},
        {"a long gap filled", fPulses(341, 641, fPulses(1, 301)), {}, -1, 1, 640, 40, "40 lines filled for 1 gap"},
        {"a gap of 30 left to the chain", fPulses(331, 631, fPulses(1, 301)), {}, -1, 1, 600, 0, "30 lines lost in 1 gap"},
        {"a PRF switch the leader states splits", fPulses(1, 601), aSwitchAt(300), 302, 2, 300, 0,
         "PRF switch at record 300: 2159.827 Hz to 1915.709 Hz"},
        {"a wild slant range", fPulses(1, 601), [](auto& c) { c[200].mRange = -5; c[201].mRange = 2000000; }, -1, 1, 600, 0,
         "2 records have a slant range that is not positive or held for fewer than 8 records (records 200, 201)"},
        {"a slant range step followed", fPulses(1, 601),
         [](auto& c) { for (size_t i = 250; i < c.size(); ++i) c[i].mRange += 75; },
         -1, 1, 600, 0, "the slant range of the first sample moves by +75 m at record 250", 75},
    };
    for (const CCase& c : aCases) {
        SCOPED_TRACE(c.mName);
        std::vector<CRecordCodes> aCodes = fAlosRecords(c.mLines);
        if (c.mEdit) c.mEdit(aCodes);
        const CLinePlan aPlan = fqorvPlanLines(aCodes, fFamilyArchive(ENativeFamily::Alos, c.mLeaderSwitch));
        ASSERT_EQ(aPlan.mProducts.size(), c.mProducts);
        const CPlannedProduct& p = aPlan.mProducts.front();
        EXPECT_EQ(static_cast<int64_t>(p.mLines.size()), c.mLines0);
        EXPECT_EQ(fFillLines(p), c.mFills0);
        EXPECT_TRUE(fNoted(aPlan, c.mNote));
        EXPECT_EQ(p.mPriCode, static_cast<int>(kAlosPrf));
        EXPECT_NEAR(p.mFirstPulseTime, kT0, 50e-6);
        EXPECT_EQ(p.mFirstRange, 850000);
        // The counters the chain reads never repeat or go back; the range of a line is its
        // record's unless that one is wild; byte 60 holds the ERS code of the PRF.
        uint32_t aLast = 0;
        for (const CPlannedLine& l : p.mLines) {
            EXPECT_GT(l.mCounter, aLast);
            aLast = l.mCounter;
            EXPECT_EQ(l.mPri, 2193);
            if (l.mSource >= 0) {
                EXPECT_EQ(l.mRange, 850000 + (l.mSource >= 250 ? c.mRangeStep : 0)) << "record " << l.mSource;
            }
        }
    }
    // The leader's switch must match the records' within two lines, and no switch can stand on the
    // last line.
    struct CRefusal {
        int64_t mSwitchRecord, mLeaderLine;
        const char* mWords;
    };
    for (const CRefusal& r : {CRefusal{300, 304, "the leader states a PRF switch at line 304, the records switch at line 301"},
                              CRefusal{-1, 200, "a PRF switch at line 200; the records keep to PRF 2159.827 Hz"},
                              CRefusal{599, -1, "at record 599, line 600, the last of the file: one line at the new PRF"},
                              CRefusal{-1, 600, "the leader states a PRF switch at line 600, the last of the file"}}) {
        std::vector<CRecordCodes> aCodes = fAlosRecords(fPulses(1, 601));
        if (r.mSwitchRecord >= 0) aSwitchAt(r.mSwitchRecord)(aCodes);
        const std::string aWords = fFailure(CQORV_ERR_IMPORT_PRF_SWITCH, [&] {
            fqorvPlanLines(aCodes, fFamilyArchive(ENativeFamily::Alos, r.mLeaderLine));
        });
        EXPECT_NE(aWords.find(r.mWords), std::string::npos) << aWords;
    }
}

}  // namespace
