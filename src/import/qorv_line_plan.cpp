#include "qorv_line_plan.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "qorv_errors.h"
#include "qorv_fbaq.h"
#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"

namespace {

using CCodes = std::vector<CRecordCodes>;

/// Events a note names one by one before it only counts them.
constexpr std::size_t CQORV_NOTE_LISTED = 4;
/// One clock reading in this many may lie off the others before the clock counts as going backwards.
constexpr int64_t CQORV_CLOCK_OFF_RATIO = 100;
/// A clock further than this (s) from the archive's scene time gives way to it.
constexpr double CQORV_CLOCK_SCENE_TOLERANCE = 1.0;

long long fLL(int64_t theValue) { return static_cast<long long>(theValue); }

/// A record whose codes count: an ERS record with its marker; of ASAR only the echo packets (noise
/// and calibration packets share the counter, nothing else).
bool fTrusted(const CRecordCodes& c) { return c.mMarker && c.mEcho; }

/// What a sensor family's codes mean: how its counter counts, what its PRF code is, which window
/// codes are plausible and which of their steps the chain follows.
class CRules {
public:
    explicit CRules(const CNativeArchive& a)
        : mFamily(a.mFamily), mSamplingRate(a.mSamplingRate), mSamplesPos(a.mLayout.mSamplesPos),
          mLayoutSamples(a.mLayout.mSamples)
    {
    }

    bool isAsar() const { return mFamily == ENativeFamily::Asar; }
    bool isAlos() const { return mFamily == ENativeFamily::Alos; }

    // Counters: ERS and ASAR count in 24 bits and wrap; ALOS line numbers do not.
    bool wraps() const { return !isAlos(); }
    int64_t unwrappedFirst(uint32_t theCounter) const { return wraps() ? theCounter & (CQORV_SPAN - 1) : theCounter; }
    /// The step from the unwrapped counter theFrom to the counter theTo as read: forward across a
    /// wrap, negative when theTo lies behind (a repeat, an overlap, a reset).
    int64_t counterStep(int64_t theFrom, uint32_t theTo) const
    {
        if (!wraps()) return static_cast<int64_t>(theTo) - theFrom;
        const int64_t aStep = (static_cast<int64_t>(theTo) - theFrom) & (CQORV_SPAN - 1);
        return aStep >= CQORV_SPAN / 2 ? aStep - CQORV_SPAN : aStep;
    }
    bool wrapsBetween(int64_t theBefore, int64_t theAfter) const
    {
        return wraps() && (theAfter >> NQORV_ERS::COUNTER_BITS) > (theBefore >> NQORV_ERS::COUNTER_BITS);
    }

    // The PRF code: ERS a PRI code in 210.94 ns, ASAR a PRI in samples, ALOS the PRF in mHz.
    int priCode(const CRecordCodes& c) const { return isAlos() ? static_cast<int>(c.mPrfMilliHz) : c.mPri; }
    double prfOf(int theCode) const
    {
        if (isAsar()) return mSamplingRate / theCode;
        if (isAlos()) return theCode * 1e-3;
        return 1.0 / ((theCode + NQORV_ERS::PRI_OFFSET) * NQORV_ERS::PRI_UNIT);
    }
    double prfMin() const { return isAsar() ? NQORV_ASAR::PRF_MIN : isAlos() ? NQORV_ALOS::PRF_MIN : NQORV_ERS::PRF_MIN; }
    double prfMax() const { return isAsar() ? NQORV_ASAR::PRF_MAX : isAlos() ? NQORV_ALOS::PRF_MAX : NQORV_ERS::PRF_MAX; }
    bool validPri(int theCode) const
    {
        const double aPrf = prfOf(theCode);
        return theCode > 0 && aPrf >= prfMin() && aPrf <= prfMax();
    }
    /// The code written at byte 60: the product's own, or for ALOS the ERS PRI code of its PRF
    /// (the chain reads byte 60 of every raw product but ENVISAT's as an ERS code).
    uint16_t writtenPri(int theCode) const
    {
        if (!isAlos()) return static_cast<uint16_t>(theCode);
        const double aCode = std::round(1.0 / (prfOf(theCode) * NQORV_ERS::PRI_UNIT)) - NQORV_ERS::PRI_OFFSET;
        return static_cast<uint16_t>(std::clamp(aCode, 0.0, 65535.0));
    }
    /// "PRI code 2820 (PRF 1679.902 Hz)", "PRF 2159.827 Hz".
    std::string priWords(int theCode) const
    {
        return isAlos() ? fqorvStringFormat("PRF %.3f Hz", prfOf(theCode))
                        : fqorvStringFormat("PRI code %d (PRF %.3f Hz)", theCode, prfOf(theCode));
    }
    /// " a PRI code other than 2820 (", " a PRF other than 2159.827 Hz (".
    std::string otherPriWords(int theCode) const
    {
        return isAlos() ? fqorvStringFormat(" a PRF other than %.3f Hz (", prfOf(theCode))
                        : fqorvStringFormat(" a PRI code other than %d (", theCode);
    }
    std::string priChangeWords(int theFrom, int theTo, int64_t theRecord) const
    {
        if (isAlos())
            return fqorvStringFormat("PRF switch at record %lld: %.3f Hz to %.3f Hz", fLL(theRecord), prfOf(theFrom),
                                     prfOf(theTo));
        return fqorvStringFormat("%d (%.3f Hz) to %d (%.3f Hz) at record %lld", theFrom, prfOf(theFrom), theTo,
                                 prfOf(theTo), fLL(theRecord));
    }

    // The window: ERS a SWST code (4 samples), ASAR a SWST in samples, ALOS the slant range of the
    // first sample in m.
    int64_t window(const CRecordCodes& c) const { return isAlos() ? c.mRange : c.mSwst; }
    bool validWindow(int64_t theCode, int thePriCode) const
    {
        if (isAsar()) return theCode >= 1 && theCode < thePriCode;   // the window opens within the pulse interval
        if (isAlos()) return theCode > 0;
        return theCode >= NQORV_ERS::SWST_MIN && theCode <= NQORV_ERS::SWST_MAX;
    }
    /// ERS: the chain follows steps of 22 codes only; it follows any ASAR or ALOS step.
    bool stepFollowed(int64_t theSteps) const { return isAsar() || isAlos() || theSteps % NQORV_ERS::SWST_STEP == 0; }
    const char* windowName() const { return isAlos() ? "slant range" : "window code"; }
    std::string stepWords(int64_t theSteps) const
    {
        if (isAsar()) return fqorvStringFormat("by %+lld samples", fLL(theSteps));
        if (isAlos()) return fqorvStringFormat("by %+lld m", fLL(theSteps));
        return fqorvStringFormat("by %+lld codes (%+lld samples)", fLL(theSteps),
                                 fLL(theSteps * NQORV_ERS::SWST_SAMPLES_PER_CODE));
    }
    std::string garbageWindowWords(int thePriCode) const
    {
        const std::string aHeld = " or held for fewer than " + std::to_string(CQORV_PLAN_PERSISTENCE) + " records";
        if (isAsar()) return "a window code outside 1 .. " + std::to_string(thePriCode - 1) + " samples" + aHeld;
        if (isAlos()) return "a slant range that is not positive" + aHeld;
        return "a window code out of range, off the steps of " + std::to_string(NQORV_ERS::SWST_STEP) + " codes" + aHeld;
    }
    /// The failure's words when no window code holds: theCode the most frequent of theRecords.
    std::string noWindowWords(int64_t theCode, const std::string& theRecords, int thePriCode) const
    {
        const std::string aHolds = fqorvStringFormat(" holds for %d records", CQORV_PLAN_PERSISTENCE);
        if (isAsar())
            return fqorvStringFormat("SWST %lld samples, the most frequent of %s: no SWST in 1 .. %d samples", fLL(theCode),
                                     theRecords.c_str(), thePriCode - 1) + aHolds;
        if (isAlos())
            return fqorvStringFormat("slant range %lld m, the most frequent of %s: no positive slant range", fLL(theCode),
                                     theRecords.c_str()) + aHolds;
        return fqorvStringFormat("SWST code %lld, the most frequent of %s: no SWST code in %d .. %d", fLL(theCode),
                                 theRecords.c_str(), NQORV_ERS::SWST_MIN, NQORV_ERS::SWST_MAX) + aHolds;
    }

    /// A line of record c: where an ASAR packet stands and how many samples it decodes to.
    void describeSource(CPlannedLine& l, const CRecordCodes& c) const
    {
        if (!isAsar()) return;
        l.mOffset = c.mOffset;
        l.mLength = c.mLength;
        l.mSamples = static_cast<uint32_t>(c.mLength > mSamplesPos ? fqorvFbaqSamples(c.mLength - mSamplesPos) : 0);
    }
    int layoutSamples() const { return mLayoutSamples; }

private:
    static constexpr int64_t CQORV_SPAN = int64_t{1} << NQORV_ERS::COUNTER_BITS;   // ASAR counts in as many bits
    ENativeFamily mFamily;
    double mSamplingRate;
    uint32_t mSamplesPos;
    int mLayoutSamples;
};

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
    int64_t mLeftOutSince = 0;   // ASAR: packets left out (no echoes) since the last line
    CTally mFills, mGaps, mRepeats, mDropped, mPriGarbage;
};

/// The code most trusted records carry (the smallest of equals), for a failure's words.
template <class TCode>
int64_t fMostFrequent(const CCodes& theCodes, int64_t theFirst, int64_t theLast, TCode theCode)
{
    std::vector<int64_t> aCodes;
    for (int64_t i = theFirst; i <= theLast; ++i)
        if (fTrusted(theCodes[i])) aCodes.push_back(theCode(theCodes[i]));
    std::sort(aCodes.begin(), aCodes.end());
    int64_t aBest = aCodes.empty() ? 0 : aCodes.front();
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

/// For each trusted record, how many such records from it on carry the same code (the others
/// neither count nor break a run); 0 for the others.
template <class TCode>
std::vector<int32_t> fRunLengths(const CCodes& theCodes, TCode theCode)
{
    std::vector<int32_t> aRun(theCodes.size(), 0);
    int64_t aNext = -1;
    for (int64_t i = static_cast<int64_t>(theCodes.size()) - 1; i >= 0; --i) {
        if (!fTrusted(theCodes[i])) continue;
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
std::vector<int64_t> fResolveCounters(const CCodes& theCodes, const CRules& theRules, std::vector<std::string>& theNotes)
{
    const int64_t n = static_cast<int64_t>(theCodes.size());
    std::vector<int64_t> aCounter(theCodes.size());
    CTally aUnmarked, aGarbled, aWraps;
    for (int64_t i = 0; i < n; ++i) {
        const CRecordCodes& c = theCodes[i];
        if (!c.mMarker) aUnmarked.addRecord(i);
        if (i == 0) {
            aCounter[0] = theRules.unwrappedFirst(c.mCounter);
            continue;
        }
        const int64_t aBefore = aCounter[i - 1];
        aCounter[i] = c.mMarker ? aBefore + theRules.counterStep(aBefore, c.mCounter) : aBefore + 1;
        if (c.mMarker && !fFits(aCounter[i] - aBefore) && i + 1 < n && theCodes[i + 1].mMarker) {
            const uint32_t aNext = theCodes[i + 1].mCounter;
            if (!fFits(theRules.counterStep(aCounter[i], aNext)) && fFits(theRules.counterStep(aBefore, aNext))) {
                aGarbled.addRecord(i);
                aCounter[i] = aBefore + 1;
            }
        }
        if (theRules.wrapsBetween(aBefore, aCounter[i])) aWraps.addRecord(i);
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
/// CQORV_PLAN_PERSISTENCE records, then from its first record each other valid code that holds as
/// long. An ALOS PRF that holds to the file's end counts however short: a switch there is refused
/// (fCheckPrfSwitch), not taken for garbage.
std::vector<CPriStretch> fPriStretches(const CCodes& theCodes, const CRules& theRules)
{
    auto aPri = [&](const CRecordCodes& c) { return theRules.priCode(c); };
    const std::vector<int32_t> aRun = fRunLengths(theCodes, aPri);
    const int64_t n = static_cast<int64_t>(theCodes.size());
    std::vector<CPriStretch> aStretches;
    for (int64_t i = 0; i < n; ++i) {
        const int aCode = aPri(theCodes[i]);
        const bool aHolds = aRun[i] >= CQORV_PLAN_PERSISTENCE || (theRules.isAlos() && aRun[i] > 0 && i + aRun[i] == n);
        if (!aHolds || !theRules.validPri(aCode)) continue;
        if (!aStretches.empty() && aStretches.back().mCode == aCode) continue;
        aStretches.push_back({aStretches.empty() ? 0 : i, aCode});
    }
    if (aStretches.empty()) {
        const int aCode = static_cast<int>(fMostFrequent(theCodes, 0, n - 1, aPri));
        fqorvImportFail(CQORV_ERR_IMPORT_CODE_RANGE,
                        theRules.priWords(aCode) +
                            fqorvStringFormat(", the most frequent: no %s in the band %.0f .. %.0f Hz holds for %d records",
                                              theRules.isAlos() ? "PRF" : "PRI code", theRules.prfMin(),
                                              theRules.prfMax(), CQORV_PLAN_PERSISTENCE));
    }
    return aStretches;
}

/// ALOS: the PRF switch of the records against the one the leader states (the line number of the
/// first line at the new PRF, as the records number their lines). 979214 when they lie more than
/// CQORV_PLAN_SWITCH_TOLERANCE lines apart, when the leader states a switch within the file's
/// lines that the records do not hold, and when either switches on the file's last line (a product
/// of one line at the new PRF cannot be focused).
void fCheckPrfSwitch(const CCodes& theCodes, const std::vector<CPriStretch>& thePri, const CRules& theRules,
                     int64_t theLeaderLine, std::vector<std::string>& theNotes)
{
    const int64_t n = static_cast<int64_t>(theCodes.size());
    const int64_t aLastLine = theCodes.back().mCounter;
    const std::string aLast = fqorvStringFormat("line %lld, the last of the file", fLL(aLastLine));
    if (thePri.size() > 1 && thePri[1].mFirst == n - 1)
        fqorvImportFail(CQORV_ERR_IMPORT_PRF_SWITCH,
                        "the PRF switches from " + theRules.priWords(thePri[0].mCode) + " to " +
                            theRules.priWords(thePri[1].mCode) + " at record " + std::to_string(n - 1) + ", " + aLast +
                            ": one line at the new PRF cannot be focused");
    if (theLeaderLine < 0) return;
    if (theLeaderLine == aLastLine)
        fqorvImportFail(CQORV_ERR_IMPORT_PRF_SWITCH,
                        fqorvStringFormat("the leader states a PRF switch at %s: one line at the new PRF cannot be focused",
                                          aLast.c_str()));
    if (thePri.size() > 1) {
        const int64_t aLine = theCodes[thePri[1].mFirst].mCounter;
        if (std::abs(aLine - theLeaderLine) > CQORV_PLAN_SWITCH_TOLERANCE)
            fqorvImportFail(CQORV_ERR_IMPORT_PRF_SWITCH,
                            fqorvStringFormat("the leader states a PRF switch at line %lld, the records switch at line "
                                              "%lld (record %lld)",
                                              fLL(theLeaderLine), fLL(aLine), fLL(thePri[1].mFirst)));
    } else if (theLeaderLine > aLastLine) {
        theNotes.push_back(fqorvStringFormat("the leader states a PRF switch at line %lld, beyond the file's last line %lld",
                                             fLL(theLeaderLine), fLL(aLastLine)));
    } else {
        fqorvImportFail(CQORV_ERR_IMPORT_PRF_SWITCH,
                        fqorvStringFormat("the leader states a PRF switch at line %lld; the records keep to ",
                                          fLL(theLeaderLine)) +
                            theRules.priWords(thePri[0].mCode));
    }
}

// ------------------------------------------------------------------------------------------------
// The walk of the records into products

/// The records in file order, as the chain will see them: a step of the counter from the highest
/// one so far of up to CQORV_CHAIN_GAP_LIMIT + 1 is left to the chain, a longer one up to
/// CQORV_PLAN_MAX_FILL + 1 gets fill lines, a counter that does not grow is left for the chain to
/// drop (ALOS: dropped here, the chain would keep it), and a jump beyond these (either way) or a
/// PRI change ends the product. A record opens a product only when its counter leads into the next
/// record's; a jump that does not is left out. ASAR packets that are no echoes are no lines: their
/// pulses become gaps like lost lines, which keeps the lines on the pulse grid.
std::vector<CDraft> fWalkRecords(const CCodes& theCodes, const std::vector<int64_t>& theCounter,
                                 const std::vector<CPriStretch>& thePri, const CRules& theRules,
                                 std::vector<std::string>& theNotes)
{
    const int64_t n = static_cast<int64_t>(theCounter.size());
    std::vector<CDraft> aDrafts;
    bool aOpen = false;
    std::size_t aStretch = 0;
    CTally aLeftOut, aJumps, aPriChanges, aNoEcho;

    auto aLeads = [&](int64_t i) {
        return theCodes[i].mMarker && i + 1 < n && fFits(theCounter[i + 1] - theCounter[i]);
    };
    auto aLine = [&](CDraft& d, int64_t theSource, int64_t theUnwrapped) {
        CPlannedLine l;
        if (theSource >= 0) {
            const CRecordCodes& c = theCodes[theSource];
            if (c.mMarker && theRules.priCode(c) != d.mProduct.mPriCode) d.mPriGarbage.addRecord(theSource);
            theRules.describeSource(l, c);
        }
        l.mSource = theSource;
        l.mCounter = static_cast<uint32_t>(std::max<int64_t>(1, theUnwrapped - d.mFirstCounter + 1));
        l.mPri = theRules.writtenPri(d.mProduct.mPriCode);
        d.mProduct.mLines.push_back(l);
        d.mLeftOutSince = 0;
    };
    auto aStart = [&](int64_t i) {
        CDraft& d = aDrafts.emplace_back();
        d.mProduct.mPriCode = thePri[aStretch].mCode;
        d.mProduct.mPrf = theRules.prfOf(d.mProduct.mPriCode);
        d.mProduct.mFirstRecord = i;
        d.mFirstCounter = d.mTopCounter = theCounter[i];
        aOpen = true;
    };

    for (int64_t i = 0; i < n; ++i) {
        if (aStretch + 1 < thePri.size() && thePri[aStretch + 1].mFirst == i) {
            const int aFrom = thePri[aStretch].mCode, aTo = thePri[aStretch + 1].mCode;
            aPriChanges.add([&] { return theRules.priChangeWords(aFrom, aTo, i); });
            ++aStretch;
            aOpen = false;
        }
        if (!theCodes[i].mEcho) {
            aNoEcho.addRecord(i);
            if (aOpen) ++aDrafts.back().mLeftOutSince;
            continue;
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
        if (aStep <= 0 && theRules.isAlos()) {
            d.mDropped.addRecord(i);
            continue;
        }
        // The pulses of packets left out are no lost lines.
        const int64_t aLost = aStep - 1 - d.mLeftOutSince;
        if (aStep > CQORV_CHAIN_GAP_LIMIT + 1) {
            d.mFills.add([&] { return fqorvStringFormat("%lld before record %lld", fLL(aStep - 1), fLL(i)); },
                         aStep - 1);
            for (int64_t k = 1; k < aStep; ++k) aLine(d, -1, d.mTopCounter + k);
        } else if (aLost > 0) {
            d.mGaps.add([&] { return fqorvStringFormat("%lld before record %lld", fLL(aLost), fLL(i)); }, aLost);
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
        theNotes.push_back(std::string(theRules.isAlos() ? "the PRF changes" : "the PRI code changes") +
                           ", where a new product starts (one PRF per product): " + aPriChanges.list());
    if (!aNoEcho.empty())
        theNotes.push_back(fCount(aNoEcho.count(), "packet is", "packets are") +
                           " no echo (noise or calibration) and left out (" + aNoEcho.records() +
                           "): their pulses are gaps of the line counter, filled as lost lines are");
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
// Window codes

/// The window of every line of a product (ERS, ASAR: the SWST code; ALOS: the slant range of the
/// first sample): from its first line the product's first plausible code that holds for
/// CQORV_PLAN_PERSISTENCE of its records, then each change to a plausible code that holds as long
/// and that the chain follows (ERS: steps of a multiple of NQORV_ERS::SWST_STEP; ASAR and ALOS:
/// any). The chain shifts a line by the difference from the first line's code, so only such
/// changes are kept; any other code is written as the one in force.
void fPlanWindow(CDraft& theDraft, const CCodes& theCodes, const CRules& theRules, const std::vector<int32_t>& theRun,
                 const std::vector<int64_t>& theTrustedBefore)
{
    CPlannedProduct& p = theDraft.mProduct;
    auto aCode = [&](int64_t i) { return theRules.window(theCodes[i]); };
    // A run counts within the product only.
    const int64_t aTrustedAtEnd = theTrustedBefore[p.mLastRecord + 1];
    auto aHolds = [&](int64_t i) {
        return std::min<int64_t>(theRun[i], aTrustedAtEnd - theTrustedBefore[i]) >= CQORV_PLAN_PERSISTENCE;
    };
    auto aTrusted = [&](const CPlannedLine& l) { return l.mSource >= 0 && fTrusted(theCodes[l.mSource]); };
    auto aValid = [&](int64_t theCode) { return theRules.validWindow(theCode, p.mPriCode); };

    int64_t aInForce = -1;
    int64_t aFrom = -1;
    for (const CPlannedLine& l : p.mLines)
        if (aTrusted(l) && aValid(aCode(l.mSource)) && aHolds(l.mSource)) {
            aInForce = aCode(l.mSource);
            aFrom = l.mSource;
            break;
        }
    if (aFrom < 0) {
        const int64_t aMost =
            fMostFrequent(theCodes, p.mFirstRecord, p.mLastRecord, [&](const CRecordCodes& c) { return theRules.window(c); });
        fqorvImportFail(CQORV_ERR_IMPORT_CODE_RANGE,
                        theRules.noWindowWords(aMost,
                                               fqorvStringFormat("records %lld to %lld", fLL(p.mFirstRecord), fLL(p.mLastRecord)),
                                               p.mPriCode));
    }
    // The records before the first one that carries the held code take it too.
    int64_t aFirstSame = aFrom;
    for (const CPlannedLine& l : p.mLines)
        if (aTrusted(l) && aCode(l.mSource) == aInForce) {
            aFirstSame = l.mSource;
            break;
        }
    if (aFirstSame > p.mFirstRecord)
        p.mNotes.push_back(fqorvStringFormat("records %lld to %lld come before the first %s that holds "
                                             "(%lld from record %lld) and are written with it",
                                             fLL(p.mFirstRecord), fLL(aFirstSame - 1), theRules.windowName(), fLL(aInForce),
                                             fLL(aFrom)));

    CTally aChanges, aGarbage;
    const bool aRange = theRules.isAlos();
    for (CPlannedLine& l : p.mLines) {
        if (aTrusted(l) && l.mSource > aFirstSame && aCode(l.mSource) != aInForce) {
            const int64_t aNew = aCode(l.mSource);
            const int64_t aSteps = aNew - aInForce;
            if (aValid(aNew) && theRules.stepFollowed(aSteps) && aHolds(l.mSource)) {
                aChanges.add([&] { return theRules.stepWords(aSteps) + " at record " + std::to_string(l.mSource); });
                aInForce = aNew;
            } else {
                aGarbage.addRecord(l.mSource);
            }
        }
        if (aRange) {
            l.mRange = static_cast<int32_t>(aInForce);
        } else {
            l.mSwst = static_cast<uint16_t>(aInForce);
        }
    }
    p.mFirstSwst = p.mLines.front().mSwst;
    p.mFirstRange = p.mLines.front().mRange;
    if (!aChanges.empty())
        p.mNotes.push_back(std::string(aRange ? "the slant range of the first sample" : "the sampling window start") +
                           " moves " + aChanges.list());
    if (!aGarbage.empty())
        p.mNotes.push_back(fCount(aGarbage.count(), "record has", "records have") + " " +
                           theRules.garbageWindowWords(p.mPriCode) + " (" + aGarbage.records() + "): written as the " +
                           (aRange ? "range" : "code") + " in force");
}

/// Complex samples per line of a product: the most its lines' packets decode to (ASAR), the
/// layout's otherwise.
int fProductSamples(const CPlannedProduct& p, int theLayoutSamples)
{
    uint32_t aMost = 0;
    for (const CPlannedLine& l : p.mLines) aMost = std::max(aMost, l.mSamples);
    return aMost > 0 ? static_cast<int>(aMost) : theLayoutSamples;
}

// ------------------------------------------------------------------------------------------------
// Times

struct CClockFit {
    double mFirstPulse = NAN;   // s from the reference day, NaN when no reading serves
    int64_t mReadings = 0;      // readings of records with their marker
    CTally mOff;                // readings off the median window
};

/// The time of a product's first pulse from the clock of its records: each reading T_i is no later
/// than its pulse (latched up to mLatchPulses pulses before, cut to whole ticks), so T_i - n_i / PRF
/// is no later than the first pulse, and the largest of these values within a tick and the latch's
/// pulses of their median comes within a fraction of a tick of it. The window is a pulse at least:
/// a clock of microseconds reads the pulses no closer than the instrument times them.
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
        if (l.mSource < 0 || !fTrusted(theCodes[l.mSource])) continue;
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
    const double aWindow = std::max(theClock.mTickSeconds + theClock.mLatchPulses / p.mPrf, 1.0 / p.mPrf);
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
    if (std::none_of(theCodes.begin(), theCodes.end(), fTrusted))
        fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES,
                        fqorvStringFormat("none of the %lld packets of the data file is an echo", fLL(n)));
    if (theArchive.mFamily == ENativeFamily::Asar && !(theArchive.mSamplingRate > 0.0))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, "no sampling rate: the PRI codes of the packets count its samples");
    const CRules aRules(theArchive);
    CLinePlan aPlan;
    aPlan.mRecords = n;

    const std::vector<int64_t> aCounter = fResolveCounters(theCodes, aRules, aPlan.mNotes);
    const std::vector<CPriStretch> aPri = fPriStretches(theCodes, aRules);
    if (aRules.isAlos()) fCheckPrfSwitch(theCodes, aPri, aRules, theArchive.mPrfSwitchLine, aPlan.mNotes);
    std::vector<CDraft> aDrafts = fWalkRecords(theCodes, aCounter, aPri, aRules, aPlan.mNotes);
    fDropShortProducts(aDrafts, n, aPlan.mNotes);

    std::vector<int64_t> aTrustedBefore(theCodes.size() + 1, 0);
    for (int64_t i = 0; i < n; ++i) aTrustedBefore[i + 1] = aTrustedBefore[i] + (fTrusted(theCodes[i]) ? 1 : 0);
    const std::vector<int32_t> aWindowRun = fRunLengths(theCodes, [&](const CRecordCodes& c) { return aRules.window(c); });
    for (CDraft& d : aDrafts) {
        fPlanWindow(d, theCodes, aRules, aWindowRun, aTrustedBefore);
        d.mProduct.mSamples = fProductSamples(d.mProduct, aRules.layoutSamples());
    }

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
        if (!d.mDropped.empty())
            aNotes.push_back(fCount(d.mDropped.count(), "record repeats or goes back to", "records repeat or go back to") +
                             " earlier line numbers (" + d.mDropped.records() + "): dropped");
        if (!d.mPriGarbage.empty())
            aNotes.push_back(fCount(d.mPriGarbage.count(), "record has", "records have") +
                             aRules.otherPriWords(p.mPriCode) + d.mPriGarbage.records() +
                             "): written as " + (aRules.isAlos() ? aRules.priWords(p.mPriCode) : std::to_string(p.mPriCode)));
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
        q.mFirstRange = q.mLines.front().mRange;
        q.mSamples = fProductSamples(q, p.mSamples);
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
