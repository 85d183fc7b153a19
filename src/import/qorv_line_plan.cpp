#include "qorv_line_plan.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"

namespace {

using CCodes = std::vector<CRecordCodes>;

constexpr int64_t CQORV_COUNTER_SPAN = int64_t{1} << NQORV_ERS::COUNTER_BITS;
/// Events a note names one by one before it only counts them.
constexpr std::size_t CQORV_NOTE_LISTED = 4;
/// One clock reading in this many may lie off the others before the clock counts as going backwards.
constexpr int64_t CQORV_CLOCK_OFF_RATIO = 100;
/// Pulses by which a clock reading may precede its pulse: it is latched once every four pulses.
constexpr int CQORV_CLOCK_LATCH_PULSES = 4;
/// A clock further than this (s) from the archive's scene time gives way to it.
constexpr double CQORV_CLOCK_SCENE_TOLERANCE = 1.0;

long long fLL(int64_t theValue) { return static_cast<long long>(theValue); }

double fPrfOf(int theCode) { return 1.0 / ((theCode + NQORV_ERS::PRI_OFFSET) * NQORV_ERS::PRI_UNIT); }

bool fValidPri(int theCode)
{
    const double aPrf = fPrfOf(theCode);
    return aPrf >= NQORV_ERS::PRF_MIN && aPrf <= NQORV_ERS::PRF_MAX;
}

bool fValidSwst(int theCode) { return theCode >= NQORV_ERS::SWST_MIN && theCode <= NQORV_ERS::SWST_MAX; }

/// The step from the unwrapped counter theFrom to the 24-bit counter theTo: forward across a wrap,
/// negative when theTo lies behind (a repeat, an overlap, a reset).
int64_t fCounterStep(int64_t theFrom, uint32_t theTo)
{
    const int64_t aStep = (static_cast<int64_t>(theTo) - theFrom) & (CQORV_COUNTER_SPAN - 1);
    return aStep >= CQORV_COUNTER_SPAN / 2 ? aStep - CQORV_COUNTER_SPAN : aStep;
}

/// A step by which one counter fits the next: the next line or a gap the chain fills itself. It
/// is narrower than the steps a product holds (up to CQORV_PLAN_MAX_FILL + 1), so that a counter
/// garbled a few hundred lines ahead is not taken for a gap, whose fill lines would turn the good
/// records after it into repeats.
bool fFits(int64_t theStep) { return theStep >= 1 && theStep <= CQORV_CHAIN_GAP_LIMIT + 1; }

std::string fCount(int64_t theCount, const char* theOne, const char* theMany)
{
    return std::to_string(theCount) + " " + (theCount == 1 ? theOne : theMany);
}

/// Occurrences of one kind of event, for one sentence of a note: how many, an amount summed over
/// them, and the words of the first few.
class CTally {
public:
    template <class TWords>
    void add(TWords&& theWords, int64_t theAmount = 1)
    {
        ++mCount;
        mAmount += theAmount;
        if (mListed.size() < CQORV_NOTE_LISTED) mListed.push_back(theWords());
    }
    void addRecord(int64_t theRecord) { add([theRecord] { return std::to_string(theRecord); }); }
    bool empty() const { return mCount == 0; }
    int64_t count() const { return mCount; }
    int64_t amount() const { return mAmount; }
    /// "a, b, c", or "a, b, c, d and 5 more".
    std::string list() const
    {
        std::string aText;
        for (const std::string& w : mListed) aText += (aText.empty() ? "" : ", ") + w;
        const int64_t aMore = mCount - static_cast<int64_t>(mListed.size());
        if (aMore > 0) aText += " and " + std::to_string(aMore) + " more";
        return aText;
    }
    /// "record 5", "records 5, 9, 12": for a tally of record indices.
    std::string records() const { return (mCount == 1 ? "record " : "records ") + list(); }

private:
    int64_t mCount = 0;
    int64_t mAmount = 0;
    std::vector<std::string> mListed;
};

/// A product while it is planned, with what its notes will count.
struct CDraft {
    CPlannedProduct mProduct;
    int64_t mFirstCounter = 0;   // unwrapped counter of the first line (written as 1)
    int64_t mTopCounter = 0;     // the highest so far: the chain measures each record from it
    CTally mFills, mGaps, mRepeats, mPriGarbage;
};

/// The code most records with their marker carry (the smallest of equals), for a failure's words.
template <class TCode>
int fMostFrequent(const CCodes& theCodes, int64_t theFirst, int64_t theLast, TCode theCode)
{
    std::vector<int> aCodes;
    for (int64_t i = theFirst; i <= theLast; ++i)
        if (theCodes[i].mMarker) aCodes.push_back(theCode(theCodes[i]));
    std::sort(aCodes.begin(), aCodes.end());
    int aBest = aCodes.empty() ? 0 : aCodes.front();
    std::size_t aBestRun = 0;
    for (std::size_t i = 0; i < aCodes.size();) {
        std::size_t j = i;
        while (j < aCodes.size() && aCodes[j] == aCodes[i]) ++j;
        if (j - i > aBestRun) {
            aBest = aCodes[i];
            aBestRun = j - i;
        }
        i = j;
    }
    return aBest;
}

/// For each record with its marker, how many such records from it on carry the same code (records
/// without the marker neither count nor break a run); 0 for the others.
template <class TCode>
std::vector<int32_t> fRunLengths(const CCodes& theCodes, TCode theCode)
{
    std::vector<int32_t> aRun(theCodes.size(), 0);
    int64_t aNext = -1;
    for (int64_t i = static_cast<int64_t>(theCodes.size()) - 1; i >= 0; --i) {
        if (!theCodes[i].mMarker) continue;
        const bool aSame = aNext >= 0 && theCode(theCodes[aNext]) == theCode(theCodes[i]);
        aRun[i] = 1 + (aSame ? aRun[aNext] : 0);
        aNext = i;
    }
    return aRun;
}

// ------------------------------------------------------------------------------------------------
// Counters

/// The counter of every record, unwrapped. What cannot be trusted becomes the one before plus 1: the
/// counter of a record without its marker, and one that fits neither neighbour while they fit
/// each other (a garbled counter between two good ones).
std::vector<int64_t> fResolveCounters(const CCodes& theCodes, std::vector<std::string>& theNotes)
{
    const int64_t n = static_cast<int64_t>(theCodes.size());
    std::vector<int64_t> aCounter(theCodes.size());
    CTally aUnmarked, aGarbled, aWraps;
    for (int64_t i = 0; i < n; ++i) {
        const CRecordCodes& c = theCodes[i];
        if (!c.mMarker) aUnmarked.addRecord(i);
        if (i == 0) {
            aCounter[0] = c.mCounter & (CQORV_COUNTER_SPAN - 1);
            continue;
        }
        const int64_t aBefore = aCounter[i - 1];
        aCounter[i] = c.mMarker ? aBefore + fCounterStep(aBefore, c.mCounter) : aBefore + 1;
        if (c.mMarker && !fFits(aCounter[i] - aBefore) && i + 1 < n && theCodes[i + 1].mMarker) {
            const uint32_t aNext = theCodes[i + 1].mCounter;
            if (!fFits(fCounterStep(aCounter[i], aNext)) && fFits(fCounterStep(aBefore, aNext))) {
                aGarbled.addRecord(i);
                aCounter[i] = aBefore + 1;
            }
        }
        if ((aCounter[i] >> NQORV_ERS::COUNTER_BITS) > (aBefore >> NQORV_ERS::COUNTER_BITS)) aWraps.addRecord(i);
    }
    if (!aUnmarked.empty())
        theNotes.push_back(fCount(aUnmarked.count(), "record lacks", "records lack") + " the 0xAA marker (" +
                           aUnmarked.records() +
                           "), so its codes are not trusted: line counter taken as the one before plus 1, window and "
                           "PRI codes as in force, clock not used");
    if (!aGarbled.empty())
        theNotes.push_back(fCount(aGarbled.count(), "line counter fits", "line counters fit") +
                           " neither the record before nor the one after (" + aGarbled.records() +
                           "): replaced by the one before plus 1");
    if (!aWraps.empty())
        theNotes.push_back("the 24-bit line counter wraps at " + aWraps.records() + "; the count goes on across it");
    return aCounter;
}

// ------------------------------------------------------------------------------------------------
// PRI codes

struct CPriStretch {
    int64_t mFirst = 0;   // first record of the stretch
    int mCode = 0;
};

/// Where each PRI code is in force: from record 0 the first valid code that holds for
/// CQORV_PLAN_PERSISTENCE records, then from its first record each other valid code that holds as long.
std::vector<CPriStretch> fPriStretches(const CCodes& theCodes)
{
    auto aPri = [](const CRecordCodes& c) { return static_cast<int>(c.mPri); };
    const std::vector<int32_t> aRun = fRunLengths(theCodes, aPri);
    std::vector<CPriStretch> aStretches;
    for (int64_t i = 0; i < static_cast<int64_t>(theCodes.size()); ++i) {
        const int aCode = aPri(theCodes[i]);
        if (aRun[i] < CQORV_PLAN_PERSISTENCE || !fValidPri(aCode)) continue;
        if (!aStretches.empty() && aStretches.back().mCode == aCode) continue;
        aStretches.push_back({aStretches.empty() ? 0 : i, aCode});
    }
    if (aStretches.empty()) {
        const int aCode = fMostFrequent(theCodes, 0, static_cast<int64_t>(theCodes.size()) - 1, aPri);
        fqorvImportFail(CQORV_ERR_IMPORT_CODE_RANGE,
                        fqorvStringFormat("PRI code %d (PRF %.3f Hz), the most frequent: no PRI code in the band "
                                          "%.0f .. %.0f Hz holds for %d records",
                                          aCode, fPrfOf(aCode), NQORV_ERS::PRF_MIN, NQORV_ERS::PRF_MAX,
                                          CQORV_PLAN_PERSISTENCE));
    }
    return aStretches;
}

// ------------------------------------------------------------------------------------------------
// The walk of the records into products

/// The records in file order, as the chain will see them: a step of the counter from the highest
/// one so far of up to CQORV_CHAIN_GAP_LIMIT + 1 is left to the chain, a longer one up to
/// CQORV_PLAN_MAX_FILL + 1 gets fill lines, a counter that does not grow is left for the chain to
/// drop, and a jump beyond these (either way) or a PRI change ends the product. A record opens a
/// product only when its counter leads into the next record's; a jump that does not is left out.
std::vector<CDraft> fWalkRecords(const CCodes& theCodes, const std::vector<int64_t>& theCounter,
                                 const std::vector<CPriStretch>& thePri, std::vector<std::string>& theNotes)
{
    const int64_t n = static_cast<int64_t>(theCounter.size());
    std::vector<CDraft> aDrafts;
    bool aOpen = false;
    std::size_t aStretch = 0;
    CTally aLeftOut, aJumps, aPriChanges;

    auto aLeads = [&](int64_t i) {
        return theCodes[i].mMarker && i + 1 < n && fFits(theCounter[i + 1] - theCounter[i]);
    };
    auto aLine = [&](CDraft& d, int64_t theSource, int64_t theUnwrapped) {
        if (theSource >= 0 && theCodes[theSource].mMarker && theCodes[theSource].mPri != d.mProduct.mPriCode)
            d.mPriGarbage.addRecord(theSource);
        CPlannedLine l;
        l.mSource = theSource;
        l.mCounter = static_cast<uint32_t>(std::max<int64_t>(1, theUnwrapped - d.mFirstCounter + 1));
        l.mPri = static_cast<uint16_t>(d.mProduct.mPriCode);
        d.mProduct.mLines.push_back(l);
    };
    auto aStart = [&](int64_t i) {
        CDraft& d = aDrafts.emplace_back();
        d.mProduct.mPriCode = thePri[aStretch].mCode;
        d.mProduct.mPrf = fPrfOf(d.mProduct.mPriCode);
        d.mProduct.mFirstRecord = i;
        d.mFirstCounter = d.mTopCounter = theCounter[i];
        aOpen = true;
    };

    for (int64_t i = 0; i < n; ++i) {
        if (aStretch + 1 < thePri.size() && thePri[aStretch + 1].mFirst == i) {
            const int aFrom = thePri[aStretch].mCode, aTo = thePri[aStretch + 1].mCode;
            aPriChanges.add([&] {
                return fqorvStringFormat("%d (%.3f Hz) to %d (%.3f Hz) at record %lld", aFrom, fPrfOf(aFrom), aTo,
                                         fPrfOf(aTo), fLL(i));
            });
            ++aStretch;
            aOpen = false;
        }
        if (!aOpen) {
            if (aLeads(i)) {
                aStart(i);
                aLine(aDrafts.back(), i, theCounter[i]);
            } else {
                aLeftOut.addRecord(i);
            }
            continue;
        }
        CDraft& d = aDrafts.back();
        const int64_t aStep = theCounter[i] - d.mTopCounter;
        if (aStep < -CQORV_PLAN_MAX_FILL || aStep > CQORV_PLAN_MAX_FILL + 1) {
            if (aLeads(i)) {
                aJumps.add([&] { return fqorvStringFormat("by %lld at record %lld", fLL(aStep), fLL(i)); });
                aStart(i);
                aLine(aDrafts.back(), i, theCounter[i]);
            } else {
                aLeftOut.addRecord(i);
            }
            continue;
        }
        if (aStep > CQORV_CHAIN_GAP_LIMIT + 1) {
            d.mFills.add([&] { return fqorvStringFormat("%lld before record %lld", fLL(aStep - 1), fLL(i)); },
                         aStep - 1);
            for (int64_t k = 1; k < aStep; ++k) aLine(d, -1, d.mTopCounter + k);
        } else if (aStep > 1) {
            d.mGaps.add([&] { return fqorvStringFormat("%lld before record %lld", fLL(aStep - 1), fLL(i)); }, aStep - 1);
        }
        if (aStep <= 0) d.mRepeats.addRecord(i);
        aLine(d, i, theCounter[i]);
        d.mTopCounter = std::max(d.mTopCounter, theCounter[i]);
    }

    for (CDraft& d : aDrafts) {
        for (auto l = d.mProduct.mLines.rbegin(); l != d.mProduct.mLines.rend(); ++l)
            if (l->mSource >= 0) {
                d.mProduct.mLastRecord = l->mSource;
                break;
            }
        d.mProduct.mPulses = d.mTopCounter - d.mFirstCounter + 1;
    }
    if (!aLeftOut.empty())
        theNotes.push_back(fCount(aLeftOut.count(), "record is", "records are") + " left out (" + aLeftOut.records() +
                           "): a line counter that does not lead into the next record's cannot start a product");
    if (!aJumps.empty())
        theNotes.push_back("the line counter jumps further than " + std::to_string(CQORV_PLAN_MAX_FILL) +
                           " lines, where a new product starts: " + aJumps.list());
    if (!aPriChanges.empty())
        theNotes.push_back("the PRI code changes, where a new product starts (one PRF per product): " +
                           aPriChanges.list());
    return aDrafts;
}

/// Leaves out the products of fewer than CQORV_PLAN_MIN_LINES lines; 979209 when none remains.
void fDropShortProducts(std::vector<CDraft>& theDrafts, int64_t theRecords, std::vector<std::string>& theNotes)
{
    CTally aShort;
    std::erase_if(theDrafts, [&](const CDraft& d) {
        if (d.mProduct.mPulses >= CQORV_PLAN_MIN_LINES) return false;
        aShort.add([&] {
            return fqorvStringFormat("records %lld to %lld (%lld lines)", fLL(d.mProduct.mFirstRecord),
                                     fLL(d.mProduct.mLastRecord), fLL(d.mProduct.mPulses));
        });
        return true;
    });
    if (!aShort.empty())
        theNotes.push_back(fCount(aShort.count(), "product is", "products are") + " left out, shorter than " +
                           std::to_string(CQORV_PLAN_MIN_LINES) + " lines: " + aShort.list());
    if (theDrafts.empty())
        fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES,
                        fqorvStringFormat("no product of at least %d lines in the %lld records of the data file",
                                          CQORV_PLAN_MIN_LINES, fLL(theRecords)));
}

// ------------------------------------------------------------------------------------------------
// SWST codes

/// The SWST code of every line of a product: from its first line the product's first valid code
/// that holds for CQORV_PLAN_PERSISTENCE of its records, then each change to a valid code that
/// differs from the one in force by a multiple of NQORV_ERS::SWST_STEP and holds as long. The
/// chain shifts a line by the difference from the first line's code, so only such steps are kept.
void fPlanWindow(CDraft& theDraft, const CCodes& theCodes, const std::vector<int32_t>& theRun,
                 const std::vector<int64_t>& theMarkedBefore)
{
    CPlannedProduct& p = theDraft.mProduct;
    auto aSwst = [](const CRecordCodes& c) { return static_cast<int>(c.mSwst); };
    // A run counts within the product only.
    const int64_t aMarkedAtEnd = theMarkedBefore[p.mLastRecord + 1];
    auto aHolds = [&](int64_t i) {
        return std::min<int64_t>(theRun[i], aMarkedAtEnd - theMarkedBefore[i]) >= CQORV_PLAN_PERSISTENCE;
    };
    auto aTrusted = [&](const CPlannedLine& l) { return l.mSource >= 0 && theCodes[l.mSource].mMarker; };

    int aInForce = -1;
    int64_t aFrom = -1;
    for (const CPlannedLine& l : p.mLines)
        if (aTrusted(l) && fValidSwst(aSwst(theCodes[l.mSource])) && aHolds(l.mSource)) {
            aInForce = aSwst(theCodes[l.mSource]);
            aFrom = l.mSource;
            break;
        }
    if (aInForce < 0) {
        const int aCode = fMostFrequent(theCodes, p.mFirstRecord, p.mLastRecord, aSwst);
        fqorvImportFail(CQORV_ERR_IMPORT_CODE_RANGE,
                        fqorvStringFormat("SWST code %d, the most frequent of records %lld to %lld: no SWST code in "
                                          "%d .. %d holds for %d records",
                                          aCode, fLL(p.mFirstRecord), fLL(p.mLastRecord), NQORV_ERS::SWST_MIN,
                                          NQORV_ERS::SWST_MAX, CQORV_PLAN_PERSISTENCE));
    }
    p.mFirstSwst = aInForce;
    // The records before the first one that carries the held code take it too.
    int64_t aFirstSame = aFrom;
    for (const CPlannedLine& l : p.mLines)
        if (aTrusted(l) && aSwst(theCodes[l.mSource]) == aInForce) {
            aFirstSame = l.mSource;
            break;
        }
    if (aFirstSame > p.mFirstRecord)
        p.mNotes.push_back(fqorvStringFormat("records %lld to %lld come before the first window code that holds "
                                             "(%d from record %lld) and are written with it",
                                             fLL(p.mFirstRecord), fLL(aFirstSame - 1), aInForce, fLL(aFrom)));

    CTally aChanges, aGarbage;
    for (CPlannedLine& l : p.mLines) {
        if (aTrusted(l) && l.mSource > aFirstSame && aSwst(theCodes[l.mSource]) != aInForce) {
            const int aCode = aSwst(theCodes[l.mSource]);
            const int aSteps = aCode - aInForce;
            if (fValidSwst(aCode) && aSteps % NQORV_ERS::SWST_STEP == 0 && aHolds(l.mSource)) {
                aChanges.add([&] {
                    return fqorvStringFormat("by %+d codes (%+d samples) at record %lld", aSteps,
                                             aSteps * NQORV_ERS::SWST_SAMPLES_PER_CODE, fLL(l.mSource));
                });
                aInForce = aCode;
            } else {
                aGarbage.addRecord(l.mSource);
            }
        }
        l.mSwst = static_cast<uint16_t>(aInForce);
    }
    if (!aChanges.empty()) p.mNotes.push_back("the sampling window start moves " + aChanges.list());
    if (!aGarbage.empty())
        p.mNotes.push_back(fCount(aGarbage.count(), "record has", "records have") +
                           " a window code out of range, off the steps of " + std::to_string(NQORV_ERS::SWST_STEP) +
                           " codes or held for fewer than " + std::to_string(CQORV_PLAN_PERSISTENCE) +
                           " records (" + aGarbage.records() + "): written as the code in force");
}

// ------------------------------------------------------------------------------------------------
// Times

struct CClockFit {
    double mFirstPulse = NAN;   // s from the reference day, NaN when no reading serves
    int64_t mReadings = 0;      // readings of records with their marker
    CTally mOff;                // readings off the median window
};

/// The time of a product's first pulse from the on-board clock of its records: each reading T_i
/// is no later than its pulse (latched up to a few pulses before, cut to whole ticks), so
/// T_i - n_i / PRF is no later than the first pulse, and the largest of these values within a
/// tick and four pulses of their median comes within a fraction of a tick of it.
CClockFit fFitClock(const CDraft& theDraft, const CCodes& theCodes, const std::vector<int64_t>& theCounter,
                    const CNativeClock& theClock)
{
    CClockFit aFit;
    if (!std::isfinite(theClock.mReferenceTime)) return aFit;
    const CPlannedProduct& p = theDraft.mProduct;
    std::vector<double> aValue;
    std::vector<int64_t> aRecord;
    aValue.reserve(p.mLines.size());
    aRecord.reserve(p.mLines.size());
    for (const CPlannedLine& l : p.mLines) {
        if (l.mSource < 0 || !theCodes[l.mSource].mMarker) continue;
        const double aPulses = static_cast<double>(theCounter[l.mSource] - theDraft.mFirstCounter);
        aValue.push_back(theClock.timeOf(theCodes[l.mSource].mClock) - aPulses / p.mPrf);
        aRecord.push_back(l.mSource);
    }
    aFit.mReadings = static_cast<int64_t>(aValue.size());
    if (aValue.empty()) return aFit;
    std::vector<double> aSorted = aValue;
    const auto aMiddle = aSorted.begin() + static_cast<std::ptrdiff_t>(aSorted.size() / 2);
    std::nth_element(aSorted.begin(), aMiddle, aSorted.end());
    const double aMedian = *aMiddle;
    const double aWindow = theClock.mTickSeconds + CQORV_CLOCK_LATCH_PULSES / p.mPrf;
    double aLatest = -INFINITY;
    for (std::size_t k = 0; k < aValue.size(); ++k) {
        if (std::abs(aValue[k] - aMedian) > aWindow) {
            aFit.mOff.addRecord(aRecord[k]);
        } else {
            aLatest = std::max(aLatest, aValue[k]);
        }
    }
    aFit.mFirstPulse = aLatest;
    return aFit;
}

/// 979206 when more than one clock reading in CQORV_CLOCK_OFF_RATIO lies off the others: the clock
/// goes backwards somewhere, at the first record whose reading falls below the one before it.
void fCheckClockOrder(const std::vector<CClockFit>& theFits, const CCodes& theCodes, const CNativeClock& theClock)
{
    int64_t aReadings = 0, aOff = 0;
    for (const CClockFit& f : theFits) {
        aReadings += f.mReadings;
        aOff += f.mOff.count();
    }
    if (aOff * CQORV_CLOCK_OFF_RATIO <= aReadings) return;
    int64_t aBefore = -1, aFalls = -1;
    for (int64_t i = 0; i < static_cast<int64_t>(theCodes.size()); ++i) {
        if (!theCodes[i].mMarker) continue;
        if (aBefore >= 0 && theClock.timeOf(theCodes[i].mClock) < theClock.timeOf(theCodes[aBefore].mClock)) {
            aFalls = i;
            break;
        }
        aBefore = i;
    }
    const std::string aWhere =
        aFalls >= 0 ? fqorvStringFormat("record %lld: the on-board clock falls from %lld to %lld ticks", fLL(aFalls),
                                        fLL(theCodes[aBefore].mClock), fLL(theCodes[aFalls].mClock))
                    : std::string("the on-board clock runs off the line counter");
    fqorvImportFail(CQORV_ERR_IMPORT_TIME_ORDER,
                    aWhere + fqorvStringFormat("; %lld of %lld readings lie off the others", fLL(aOff), fLL(aReadings)));
}

/// Each product's first pulse time: the clock's, unless the archive states a scene time that lies
/// more than CQORV_CLOCK_SCENE_TOLERANCE off it (or there is no clock): then the scene time's, with
/// a warning. The scene time places the file's pulses: a centre time their middle, a sensing start
/// the first record's pulse, the records the products leave out at their ends counted as pulses.
void fTimeProducts(std::vector<CDraft>& theDrafts, const std::vector<CClockFit>& theFits,
                   const CNativeArchive& theArchive, int64_t theRecords, CLinePlan& thePlan)
{
    const bool aCentre = std::isfinite(theArchive.mCentreTime);
    const bool aStart = !aCentre && std::isfinite(theArchive.mSensingStart);
    const char* aSceneName = aCentre ? "scene centre time" : "sensing start time";
    const CDraft& aFirst = theDrafts.front();
    const CDraft& aLast = theDrafts.back();
    const int64_t aFilePulse0 = aFirst.mFirstCounter - aFirst.mProduct.mFirstRecord;
    const int64_t aFilePulseN = aLast.mTopCounter + (theRecords - 1 - aLast.mProduct.mLastRecord);

    const double aFileMiddle = 0.5 * static_cast<double>(aFilePulse0 + aFilePulseN);

    for (std::size_t k = 0; k < theDrafts.size(); ++k) {
        CPlannedProduct& p = theDrafts[k].mProduct;
        const CClockFit& f = theFits[k];
        const double aPulse = static_cast<double>(theDrafts[k].mFirstCounter);
        const double aScene = aCentre  ? theArchive.mCentreTime + (aPulse - aFileMiddle) / p.mPrf
                              : aStart ? theArchive.mSensingStart + (aPulse - static_cast<double>(aFilePulse0)) / p.mPrf
                                       : NAN;
        const std::string aRecords = fqorvStringFormat("records %lld to %lld", fLL(p.mFirstRecord), fLL(p.mLastRecord));
        if (!f.mOff.empty())
            p.mNotes.push_back(fCount(f.mOff.count(), "clock reading", "clock readings") + " of " +
                               std::to_string(f.mReadings) + " off the others by more than a tick and four pulses (" +
                               f.mOff.records() + "): ignored");
        p.mFirstPulseTime = f.mFirstPulse;
        p.mTimeSource = "on-board clock";
        if (!std::isfinite(f.mFirstPulse)) {
            if (!std::isfinite(aScene))
                fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aRecords + ": no on-board clock reading and no scene time");
            p.mNotes.push_back(std::string("no on-board clock reading: the first pulse is timed from the ") + aSceneName);
        } else if (std::isfinite(aScene) && std::abs(f.mFirstPulse - aScene) > CQORV_CLOCK_SCENE_TOLERANCE) {
            thePlan.mWarnings.push_back(aRecords + fqorvStringFormat(": the on-board clock lies %.3f s off the %s, "
                                                                     "which times the first pulse instead",
                                                                     f.mFirstPulse - aScene, aSceneName));
        } else {
            continue;
        }
        p.mFirstPulseTime = aScene;
        p.mTimeSource = aSceneName;
    }
}

}  // namespace

CLinePlan fqorvPlanLines(const std::vector<CRecordCodes>& theCodes, const CNativeArchive& theArchive)
{
    const int64_t n = static_cast<int64_t>(theCodes.size());
    if (n == 0) fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES, "the data file holds no whole record");
    if (std::none_of(theCodes.begin(), theCodes.end(), [](const CRecordCodes& c) { return c.mMarker; }))
        fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES,
                        fqorvStringFormat("none of the %lld records of the data file carries its 0xAA marker", fLL(n)));
    CLinePlan aPlan;
    aPlan.mRecords = n;

    const std::vector<int64_t> aCounter = fResolveCounters(theCodes, aPlan.mNotes);
    const std::vector<CPriStretch> aPri = fPriStretches(theCodes);
    std::vector<CDraft> aDrafts = fWalkRecords(theCodes, aCounter, aPri, aPlan.mNotes);
    fDropShortProducts(aDrafts, n, aPlan.mNotes);

    std::vector<int64_t> aMarkedBefore(theCodes.size() + 1, 0);
    for (int64_t i = 0; i < n; ++i) aMarkedBefore[i + 1] = aMarkedBefore[i] + (theCodes[i].mMarker ? 1 : 0);
    const std::vector<int32_t> aSwstRun =
        fRunLengths(theCodes, [](const CRecordCodes& c) { return static_cast<int>(c.mSwst); });
    for (CDraft& d : aDrafts) fPlanWindow(d, theCodes, aSwstRun, aMarkedBefore);

    std::vector<CClockFit> aFits;
    for (const CDraft& d : aDrafts) aFits.push_back(fFitClock(d, theCodes, aCounter, theArchive.mClock));
    fCheckClockOrder(aFits, theCodes, theArchive.mClock);
    fTimeProducts(aDrafts, aFits, theArchive, n, aPlan);

    for (CDraft& d : aDrafts) {
        CPlannedProduct& p = d.mProduct;
        std::vector<std::string> aNotes;
        if (!d.mFills.empty())
            aNotes.push_back(fqorvStringFormat("%lld lines filled for %s of more than %d lines in the line counter: ",
                                               fLL(d.mFills.amount()), fCount(d.mFills.count(), "gap", "gaps").c_str(),
                                               CQORV_CHAIN_GAP_LIMIT) +
                             d.mFills.list());
        if (!d.mGaps.empty())
            aNotes.push_back(fqorvStringFormat("%lld lines lost in %s of up to %d lines in the line counter, left for focusing "
                                               "to fill: ",
                                               fLL(d.mGaps.amount()), fCount(d.mGaps.count(), "gap", "gaps").c_str(),
                                               CQORV_CHAIN_GAP_LIMIT) +
                             d.mGaps.list());
        if (!d.mRepeats.empty())
            aNotes.push_back(fCount(d.mRepeats.count(), "record repeats or overlaps", "records repeat or overlap") +
                             " earlier lines (" + d.mRepeats.records() +
                             "): the line counter does not grow; left for focusing to drop");
        if (!d.mPriGarbage.empty())
            aNotes.push_back(fCount(d.mPriGarbage.count(), "record has", "records have") +
                             fqorvStringFormat(" a PRI code other than %d (", p.mPriCode) + d.mPriGarbage.records() +
                             fqorvStringFormat("): written as %d", p.mPriCode));
        aNotes.insert(aNotes.end(), p.mNotes.begin(), p.mNotes.end());
        p.mNotes = std::move(aNotes);
        aPlan.mProducts.push_back(std::move(p));
    }
    return aPlan;
}

CLinePlan fqorvCutPlan(const CLinePlan& thePlan, int64_t theFirst, int64_t theCount)
{
    if (theFirst < 0 || theCount < 1 || theFirst >= thePlan.mRecords)
        fqorvImportFail(CQORV_ERR_IMPORT_OPTION,
                        fqorvStringFormat("--lines %lld:%lld: the data file holds records 0 to %lld", fLL(theFirst),
                                          fLL(theCount), fLL(thePlan.mRecords - 1)));
    const int64_t aEnd = theFirst + std::min(theCount, thePlan.mRecords - theFirst);
    auto aInside = [&](const CPlannedLine& l) { return l.mSource >= theFirst && l.mSource < aEnd; };

    CLinePlan aCut;
    aCut.mRecords = thePlan.mRecords;
    aCut.mNotes = thePlan.mNotes;
    aCut.mWarnings = thePlan.mWarnings;
    for (const CPlannedProduct& p : thePlan.mProducts) {
        if (p.mLastRecord < theFirst || p.mFirstRecord >= aEnd) continue;
        // The cut product starts at a line the chain keeps in the whole product (a counter above
        // all before it): from there the chain sees the same steps as before the cut.
        std::size_t a = p.mLines.size(), b = 0;
        uint32_t aTop = 0;
        for (std::size_t k = 0; k < p.mLines.size(); ++k) {
            const CPlannedLine& l = p.mLines[k];
            if (aInside(l)) {
                if (a == p.mLines.size() && l.mCounter > aTop) a = k;
                b = k;
            }
            aTop = std::max(aTop, l.mCounter);
        }
        if (a == p.mLines.size() || b < a) continue;
        CPlannedProduct q = p;
        q.mLines.assign(p.mLines.begin() + static_cast<std::ptrdiff_t>(a),
                        p.mLines.begin() + static_cast<std::ptrdiff_t>(b + 1));
        const uint32_t aBase = q.mLines.front().mCounter;
        uint32_t aLast = 1;
        for (CPlannedLine& l : q.mLines) {
            l.mCounter = l.mCounter > aBase ? l.mCounter - aBase + 1 : 1;
            aLast = std::max(aLast, l.mCounter);
        }
        q.mFirstRecord = q.mLines.front().mSource;
        q.mLastRecord = q.mLines.back().mSource;
        q.mFirstSwst = q.mLines.front().mSwst;
        q.mPulses = aLast;
        q.mFirstPulseTime = p.mFirstPulseTime + (aBase - 1) / p.mPrf;
        aCut.mProducts.push_back(std::move(q));
    }
    if (aCut.mProducts.empty())
        fqorvImportFail(CQORV_ERR_IMPORT_OPTION,
                        fqorvStringFormat("--lines %lld:%lld: records %lld to %lld hold no line of any product",
                                          fLL(theFirst), fLL(theCount), fLL(theFirst), fLL(aEnd - 1)));
    aCut.mNotes.push_back(fqorvStringFormat("--lines %lld:%lld: the products are cut to records %lld to %lld",
                                            fLL(theFirst), fLL(theCount), fLL(theFirst), fLL(aEnd - 1)));
    return aCut;
}
