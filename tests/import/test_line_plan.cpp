// The line plan of an import: record codes in, products out, each checked against what the chain's
// line continuity makes of its prefixes.
#include <gtest/gtest.h>

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

constexpr int kPri = 2820;
constexpr int kSwst = 878;
const double kPrf = 1.0 / ((kPri + 2) * 210.94e-9);
constexpr double kT0 = 51234.5678901;   // s of day of pulse 0

/// One record per pulse index: counter from theBase, the clock latched every fourth pulse in
/// 1/256 s ticks (tick 0 at 0 s), PRI 2820, SWST 878, marker in place.
std::vector<CRecordCodes> fRecords(const std::vector<int64_t>& thePulses, uint32_t theBase = 1000)
{
    std::vector<CRecordCodes> aCodes;
    for (int64_t k : thePulses) {
        CRecordCodes c;
        c.mCounter = static_cast<uint32_t>((theBase + k) & 0xFFFFFF) | 0xAB000000u;   // high byte: not counter
        c.mClock = static_cast<uint32_t>(std::floor((kT0 + static_cast<double>(k / 4 * 4) / kPrf) * 256.0));
        c.mSwst = kSwst;
        c.mPri = kPri;
        c.mMarker = true;
        aCodes.push_back(c);
    }
    return aCodes;
}

/// Pulses [theFirst, theEnd) after thePulses.
std::vector<int64_t> fPulses(int64_t theFirst, int64_t theEnd, std::vector<int64_t> thePulses = {})
{
    for (int64_t k = theFirst; k < theEnd; ++k) thePulses.push_back(k);
    return thePulses;
}

CNativeArchive fArchive()
{
    CNativeArchive a;
    a.mClock.mReferenceTime = 0.0;
    return a;
}

/// The chain's view of a product's prefixes, written independently of the plan: a counter that
/// does not grow is dropped, steps of up to 31 are followed; false on a first counter other than 1,
/// a step beyond 31, a SWST off the 22-code steps from the first line, or a PRI other than the
/// product's. theLines: the lines the chain forms.
bool fChainFollows(const CPlannedProduct& p, int64_t& theLines)
{
    int64_t aLast = 0;
    for (const CPlannedLine& l : p.mLines) {
        const int64_t aStep = static_cast<int32_t>(l.mCounter) - aLast;
        if ((aLast == 0 && l.mCounter != 1) || aStep > 31) return false;
        if ((l.mSwst - p.mFirstSwst) % 22 != 0 || l.mPri != p.mPriCode) return false;
        if (aStep >= 1) aLast = l.mCounter;
    }
    theLines = aLast;
    return p.mLines.front().mSwst == p.mFirstSwst && aLast == p.mPulses;
}

/// Plans theCodes and checks every product against the chain's view.
CLinePlan fPlan(const std::vector<CRecordCodes>& theCodes, const CNativeArchive& theArchive = fArchive())
{
    const CLinePlan aPlan = fqorvPlanLines(theCodes, theArchive);
    for (const CPlannedProduct& p : aPlan.mProducts) {
        int64_t aLines = 0;
        EXPECT_TRUE(fChainFollows(p, aLines)) << "records " << p.mFirstRecord << " to " << p.mLastRecord;
    }
    return aPlan;
}

std::string fAllNotes(const CLinePlan& thePlan)
{
    std::string aText;
    for (const std::string& n : thePlan.mNotes) aText += n + "\n";
    for (const CPlannedProduct& p : thePlan.mProducts)
        for (const std::string& n : p.mNotes) aText += n + "\n";
    return aText;
}

int64_t fFillLines(const CPlannedProduct& p)
{
    int64_t aFills = 0;
    for (const CPlannedLine& l : p.mLines) aFills += l.mSource < 0;
    return aFills;
}

/// The parameter of the CImportFailure theRun throws, after checking its id.
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
    using CEdit = std::function<void(std::vector<CRecordCodes>&)>;
    struct CCase {
        const char* mName;
        std::vector<int64_t> mPulses;
        CEdit mEdit;
        size_t mProducts;
        int64_t mRecordLines, mFills, mSpanned;   // of the first product
        const char* mNote;
        uint32_t mBase = 1000;
    };
    const std::vector<int64_t> aClean = fPulses(0, 600);
    const CCase aCases[] = {
        {"a gap of 30 left to the chain", fPulses(330, 630, fPulses(0, 300)), {}, 1, 600, 0, 630, ""},
        {"a gap of 31 filled", fPulses(331, 631, fPulses(0, 300)), {}, 1, 600, 31, 631, "31 lines filled for 1 gap"},
        {"a gap of 4096 filled", fPulses(4396, 4696, fPulses(0, 300)), {}, 1, 600, 4096, 4696, "4096 lines filled"},
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
        EXPECT_EQ(static_cast<int64_t>(p.mLines.size()) - fFillLines(p), c.mRecordLines);
        EXPECT_EQ(fFillLines(p), c.mFills);
        EXPECT_EQ(p.mPulses, c.mSpanned);
        EXPECT_NE(fAllNotes(aPlan).find(c.mNote), std::string::npos) << fAllNotes(aPlan);
        // Each record's line counts its pulses from the product's first; untrusted codes never reach a line.
        for (const CPlannedLine& l : p.mLines) {
            if (l.mSource < 0) continue;
            EXPECT_EQ(l.mCounter, c.mPulses[l.mSource] - c.mPulses[p.mFirstRecord] + 1) << "record " << l.mSource;
            EXPECT_EQ(l.mSwst, kSwst);
            EXPECT_EQ(l.mPri, kPri);
        }
    }
}

TEST(LinePlan, PriAndSwstCodesHoldOrGiveWay)
{
    struct CCase {
        const char* mName;
        std::function<void(std::vector<CRecordCodes>&)> mEdit;
        size_t mProducts;
        int mLastPri, mLastSwst;   // written into the last line of the last product
        const char* mNote;
    };
    auto aSet = [](int theFrom, int theTo, uint16_t CRecordCodes::*theCode, int theValue) {
        return [=](std::vector<CRecordCodes>& c) {
            for (int i = theFrom; i < theTo; ++i) c[i].*theCode = static_cast<uint16_t>(theValue);
        };
    };
    const CCase aCases[] = {
        {"a PRI change splits", aSet(300, 600, &CRecordCodes::mPri, 2822), 2, 2822, kSwst, "2820 (1679.902 Hz) to 2822"},
        {"a PRI code held for 7 records", aSet(300, 307, &CRecordCodes::mPri, 2822), 1, kPri, kSwst, "7 records have a PRI code other"},
        {"a PRI code out of band", aSet(300, 600, &CRecordCodes::mPri, 100), 1, kPri, kSwst, "300 records have a PRI code"},
        {"a window step of 22 kept", aSet(300, 600, &CRecordCodes::mSwst, kSwst + 22), 1, kPri, kSwst + 22,
         "moves by +22 codes (+88 samples) at record 300"},
        {"a window step of 23 replaced", aSet(300, 600, &CRecordCodes::mSwst, kSwst + 23), 1, kPri, kSwst, "300 records have a window code"},
        {"a window step held for 7 records", aSet(300, 307, &CRecordCodes::mSwst, kSwst + 22), 1, kPri, kSwst, "7 records have a window"},
        {"a window code below 500", aSet(300, 600, &CRecordCodes::mSwst, kSwst - 19 * 22), 1, kPri, kSwst, "300 records have a window"},
        {"leading window codes", aSet(0, 5, &CRecordCodes::mSwst, 0), 1, kPri, kSwst, "records 0 to 4 come before"},
    };
    for (const CCase& c : aCases) {
        SCOPED_TRACE(c.mName);
        std::vector<CRecordCodes> aCodes = fRecords(fPulses(0, 600));
        c.mEdit(aCodes);
        const CLinePlan aPlan = fPlan(aCodes);
        ASSERT_EQ(aPlan.mProducts.size(), c.mProducts);
        EXPECT_EQ(aPlan.mProducts.back().mLines.back().mPri, c.mLastPri);
        EXPECT_EQ(aPlan.mProducts.back().mLines.back().mSwst, c.mLastSwst);
        EXPECT_EQ(aPlan.mProducts.back().mLines.front().mCounter, 1u);
        EXPECT_NE(fAllNotes(aPlan).find(c.mNote), std::string::npos) << fAllNotes(aPlan);
    }
    std::vector<CRecordCodes> aCodes = fRecords(fPulses(0, 600));
    for (CRecordCodes& c : aCodes) c.mPri = 100;
    EXPECT_NE(fFailure(CQORV_ERR_IMPORT_CODE_RANGE, [&] { fPlan(aCodes); }).find("PRI code 100"), std::string::npos);
    aCodes = fRecords(fPulses(0, 600));
    for (CRecordCodes& c : aCodes) c.mSwst = 1501;
    EXPECT_NE(fFailure(CQORV_ERR_IMPORT_CODE_RANGE, [&] { fPlan(aCodes); }).find("SWST code 1501"), std::string::npos);
}

TEST(LinePlan, TheClockTimesTheFirstPulseWithinMicroseconds)
{
    // A gap and a split: each product is timed from its own first pulse.
    std::vector<CRecordCodes> aCodes = fRecords(fPulses(9000, 13000, fPulses(40, 4000)));
    for (int i : {17, 900, 2222, 3001, 5000}) aCodes[i].mClock += (i % 2 ? 3000 : -3000);
    const CLinePlan aPlan = fPlan(aCodes);
    ASSERT_EQ(aPlan.mProducts.size(), 2u);
    // Within 10 us of the truth from about a thousand latches of a 3906 us tick.
    EXPECT_NEAR(aPlan.mProducts[0].mFirstPulseTime, kT0 + 40 / kPrf, 1e-5);
    EXPECT_NEAR(aPlan.mProducts[1].mFirstPulseTime, kT0 + 9000 / kPrf, 1e-5);
    EXPECT_EQ(aPlan.mProducts[0].mTimeSource, "on-board clock");
    EXPECT_NE(fAllNotes(aPlan).find("4 readings off the others by more than a tick and four pulses ignored (records 17, 900, 2222, 3001)"),
              std::string::npos) << fAllNotes(aPlan);

    // A scene time more than a second off the clock takes over, with a warning; one within keeps it.
    CNativeArchive aArchive = fArchive();
    std::vector<CRecordCodes> aOne = fRecords(fPulses(0, 3000));
    aArchive.mCentreTime = kT0 + 1499.5 / kPrf + 1.5;
    CLinePlan aScene = fPlan(aOne, aArchive);
    EXPECT_NEAR(aScene.mProducts[0].mFirstPulseTime, kT0 + 1.5, 1e-9);
    EXPECT_EQ(aScene.mProducts[0].mTimeSource, "scene centre time");
    ASSERT_EQ(aScene.mWarnings.size(), 1u);
    aArchive.mCentreTime = NAN;
    aArchive.mSensingStart = kT0 + 0.5;
    aScene = fPlan(aOne, aArchive);
    EXPECT_TRUE(aScene.mWarnings.empty());
    EXPECT_NEAR(aScene.mProducts[0].mFirstPulseTime, kT0, 1e-5);

    // A clock that falls back by 10 s at record 2000.
    for (size_t i = 2000; i < aOne.size(); ++i) aOne[i].mClock -= 2560;
    EXPECT_NE(fFailure(CQORV_ERR_IMPORT_TIME_ORDER, [&] { fPlan(aOne); }).find("record 2000:"), std::string::npos);
}

TEST(LinePlan, CutRenumbersFromTheFirstLineTheChainKeeps)
{
    // 0..299, a filled gap of 40, a repeat of 290..299, then on to 640.
    const std::vector<CRecordCodes> aCodes = fRecords(fPulses(350, 641, fPulses(290, 300, fPulses(340, 350, fPulses(0, 300)))));
    const CLinePlan aPlan = fPlan(aCodes);
    ASSERT_EQ(aPlan.mProducts.size(), 1u);
    struct CCase {
        int64_t mFirst, mCount;
        int64_t mFirstRecord, mLastRecord, mPulses, mFirstPulse;
    };
    // Records 300..309 hold pulses 340..349 after the fill; 310..319 are the repeat.
    for (const CCase& c : {CCase{250, 100, 250, 349, 130, 250}, CCase{300, 10, 300, 309, 10, 340},
                           CCase{312, 20, 320, 331, 12, 350}, CCase{600, 1000, 600, 610, 11, 630}}) {
        SCOPED_TRACE(c.mFirst);
        const CLinePlan aCut = fqorvCutPlan(aPlan, c.mFirst, c.mCount);
        ASSERT_EQ(aCut.mProducts.size(), 1u);
        const CPlannedProduct& p = aCut.mProducts.front();
        int64_t aLines = 0;
        EXPECT_TRUE(fChainFollows(p, aLines));
        EXPECT_EQ(p.mFirstRecord, c.mFirstRecord);
        EXPECT_EQ(p.mLastRecord, c.mLastRecord);
        EXPECT_EQ(p.mPulses, c.mPulses);
        EXPECT_NEAR(p.mFirstPulseTime, aPlan.mProducts[0].mFirstPulseTime + c.mFirstPulse / kPrf, 1e-9);
    }
    fFailure(CQORV_ERR_IMPORT_OPTION, [&] { fqorvCutPlan(aPlan, 611, 10); });
    fFailure(CQORV_ERR_IMPORT_OPTION, [&] { fqorvCutPlan(aPlan, 312, 8); });   // repeats only
}

TEST(LinePlan, AFullFrameIsPlannedInMilliseconds)
{
    // 28,000 records with gaps, repeats and garbled codes throughout.
    std::vector<int64_t> aPulses;
    for (int64_t k = 0; aPulses.size() < 28000; ++k)
        if (k % 997 != 0 || k == 0) aPulses.push_back(k % 5003 == 0 ? k - 1 : k + (k / 3001) * 40);
    std::vector<CRecordCodes> aCodes = fRecords(aPulses);
    for (size_t i = 123; i < aCodes.size(); i += 1009) aCodes[i].mSwst = 4000, aCodes[i].mPri = 7;
    const auto aStart = std::chrono::steady_clock::now();
    const CLinePlan aPlan = fqorvPlanLines(aCodes, fArchive());
    const double aMs = std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - aStart).count();
    RecordProperty("plan_ms", std::to_string(aMs));
    std::printf("28000 records planned in %.2f ms\n", aMs);
    EXPECT_EQ(aPlan.mProducts.size(), 1u);
    EXPECT_LT(aMs, 250.0);   // a loose bound that a pass quadratic in the records would break
    EXPECT_EQ(fFailure(CQORV_ERR_IMPORT_NO_LINES, [] { fqorvPlanLines(fRecords(fPulses(0, 31)), fArchive()); }).empty(), false);
}

}  // namespace
