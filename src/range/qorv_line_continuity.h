// Echo line continuity: the per-sensor line counter and sampling window start (SWST) code of each
// raw record, read from its prefix, turned into lost-line, repeated-line and range-shift decisions
// that the range compression loops act on.
//
// ERS and ENVISAT records carry a 32-bit counter and a 16-bit SWST code; JERS-1 and ALOS PALSAR a
// counter only, and some of their products the slant range of the first sample (32-bit at byte
// 116). All prefix values are big-endian. The kernel sees prefix bytes and numbers only.
#pragma once

#include <cstdint>
#include <cstdio>

/// The three places where records are read: the direct line loop (no presumming), the priming of
/// the prefilter's circular buffer, and its refill.
enum class CContinuityRoad { Direct, Priming, Refill };

/// What the loop does with the record just read.
struct CContinuityDecision {
    /// The record repeats an earlier one: it is dropped (direct road: the loop goes on with the
    /// next record for the same output line; buffer roads: the fill ends here, past this record).
    bool mDrop = false;
    /// Direct road, ERS and ENVISAT: lost lines to fill with the echo in hand before it (each filler
    /// shifted once more by the current shift).
    int mFillers = 0;
    /// Lines the loop's count moves on before this echo: output lines (direct road), input lines
    /// (refill) or buffer rows (priming).
    int mSkip = 0;
    /// The shift the fillers move by: the one in force when the gap was found, before this
    /// record's SWST code is taken.
    int mFillerShift = 0;
    /// The shift s after this record, by which its compressed line moves.
    int mShift = 0;
};

/// Prefix positions and sizes the kernel needs; -1 marks a value the records do not carry.
struct CContinuityLayout {
    int mSensor = -1;        // sensor id of "Sensor.SensorName"
    int mProduct = -1;       // product id of the user key "ORIGIN DATA", -1 when absent
    int mCounterPos = -1;    // byte of the 32-bit line counter
    int mSwstPos = -1;       // byte of the 16-bit SWST code
    int mPrefixBytes = 0;    // bytes of the record prefix
    double mPixelSpacing = 0.0;  // slant-range pixel spacing (m), for the slant-range products
    int mRangeOut = 0;       // samples per compressed line
};

/// The counters and shift of one range compression run; all reset when it is made.
class CLineContinuity {
public:
    /// theTrace and theSwstOnly: the "_swst.trace" and "_swst_only.trace" streams (may be null).
    CLineContinuity(const CContinuityLayout& theLayout, FILE* theTrace, FILE* theSwstOnly);

    /// Default prefix positions of a sensor: counter and SWST bytes (-1 when none).
    static void defaultPositions(int theSensor, int& theCounterPos, int& theSwstPos);
    /// True for the sensors whose records are checked (ERS-1, ERS-2, JERS-1, ENVISAT-1, ALOS PALSAR).
    static bool isChecked(int theSensor);
    /// True for the products whose shift comes from the slant range at byte 116.
    static bool hasSlantRange(int theProduct);

    /// Examines one record: its prefix, the loop's line (direct road and refill) or row number
    /// (priming), and the record number for the traces. The first record of a run is never a gap:
    /// on the direct road it is line 0, at priming the first record taken.
    CContinuityDecision check(const uint8_t* thePrefix, CContinuityRoad theRoad, int theLine, int theRecord);

    /// Samples by which the compressed line moves (positive: toward far range).
    int shift() const { return mShift; }
    int gapEvents() const { return mGapEvents; }
    long long lostLines() const { return mLostLines; }
    int largestGap() const { return mLargestGap; }
    int largestGapLine() const { return mLargestGapLine; }

private:
    CContinuityDecision checkErsEnvisat(CContinuityRoad theRoad, int theLine, int theRecord);
    CContinuityDecision checkJersAlos(int theLine);
    void checkSwst(const uint8_t* thePrefix, CContinuityRoad theRoad, int theLine);
    void checkSlantRange(const uint8_t* thePrefix, int theLine);
    void rememberGap(int theStep, int theLine);
    void traceBoth(const char* theFormat, ...) __attribute__((format(printf, 2, 3)));

    CContinuityLayout mLayout;
    FILE* mTrace;
    FILE* mSwstOnly;
    int32_t mLineCounter = 0;
    int32_t mLastLine = 0;
    int32_t mSwstCounter = 0;
    int32_t mFirstSwst = -9999;
    int32_t mSwstStep = 0;
    int32_t mShift = 0;
    int32_t mGapEvents = 0;
    int64_t mLostLines = 0;    // wider than the counters: a far jump repeats on every record
    int32_t mLargestGap = 0;
    int32_t mLargestGapLine = 0;
    bool mAccepted = false;      // a record has been taken (the first one is never a gap)
    double mFirstRange = -1.0;   // SR0 of the slant-range products (m); negative until the first record
    double mLastRange = 0.0;     // the last slant range kept
};

/// A big-endian 32-bit signed value at theBytes.
int32_t fqorvBigEndian32(const uint8_t* theBytes);
/// A big-endian 16-bit signed value at theBytes.
int16_t fqorvBigEndian16(const uint8_t* theBytes);
