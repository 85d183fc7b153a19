// The line plan of an import: from the codes of every record of an ERS data file to the lines of
// one or more raw products, each with the prefix codes the chain reads (line counter, SWST code,
// PRI code) and the time of its first pulse.
//
// What the chain handles itself is left in the lines as it is: lost lines (gaps of up to
// CQORV_CHAIN_GAP_LIMIT missing lines in the counter), repeated or overlapping records (a counter
// that does not grow) and window changes (SWST steps of a multiple of 22 codes). What it cannot
// handle, the plan handles and says so in its notes:
//   - the 24-bit counter wraps: counters are unwrapped and rewritten from 1 at each product's start;
//   - a gap longer than CQORV_CHAIN_GAP_LIMIT lines: fill lines are inserted (source -1), up to
//     CQORV_PLAN_MAX_FILL missing lines; a longer gap ends the product and starts another;
//   - a PRI code change: it ends the product and starts another (one PRF per product);
//   - garbage codes: a counter that fits neither its neighbours, a PRI code outside the valid PRF
//     band or one that does not hold for CQORV_PLAN_PERSISTENCE records, a SWST code outside 500 to
//     1500, off the 22-code steps or not holding for CQORV_PLAN_PERSISTENCE records, a missing
//     0xAA marker (all codes of the record suspect): each is replaced by the value in force;
//   - the clock: the time of the first pulse comes from the on-board clock of all records, not
//     from one record's ticks (see fqorvPlanLines).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "qorv_native_archive.h"

/// The chain fills gaps of up to this many missing lines itself (with copies of the next echo).
inline constexpr int CQORV_CHAIN_GAP_LIMIT = 30;
/// Gaps of up to this many missing lines are filled by the importer; a longer one splits.
inline constexpr int CQORV_PLAN_MAX_FILL = 4096;
/// Records a new PRI or SWST code must hold to count as a change rather than garbage.
inline constexpr int CQORV_PLAN_PERSISTENCE = 8;
/// Products of fewer lines than this are left out (a note says so).
inline constexpr int CQORV_PLAN_MIN_LINES = 32;

/// One line of a raw product.
struct CPlannedLine {
    int64_t mSource = -1;     // record of the data file; -1: a fill line (every sample at the I/Q bias)
    uint32_t mCounter = 0;    // the line counter written into the prefix (1 at the product's first line)
    uint16_t mSwst = 0;       // the SWST code written
    uint16_t mPri = 0;        // the PRI code written (one per product)
};

/// One raw product of an import.
struct CPlannedProduct {
    int64_t mFirstRecord = 0;         // the records of the data file it covers, first and last
    int64_t mLastRecord = 0;
    std::vector<CPlannedLine> mLines;
    int mPriCode = 0;
    double mPrf = 0.0;                // Hz, 1 / ((code + 2) * 210.94 ns)
    int mFirstSwst = 0;               // SWST code of the first line: the window start of the product
    int64_t mPulses = 0;              // pulses spanned: last counter - first counter + 1
    double mFirstPulseTime = 0.0;     // UTC of the product's first pulse (counter 1), s from the reference day
    std::string mTimeSource;          // "on-board clock", or the scene time when the clock disagreed
    std::vector<std::string> mNotes;  // what was handled, with record indices and counts
};

struct CLinePlan {
    int64_t mRecords = 0;             // whole records of the data file planned
    std::vector<CPlannedProduct> mProducts;
    std::vector<std::string> mNotes;  // about the whole file (records left out, products too short)
    std::vector<std::string> mWarnings;   // the clock fell back to the scene time (warning 195843)
};

/// Plans the products of theCodes (every whole record of the data file, in file order) of theArchive.
///
/// The time of a product's first pulse: every record's clock gives an instant T_i no later than its
/// pulse (the clock is latched at most a few pulses before and counts in 1/256 s ticks), so with
/// n_i the record's pulse index from the product's first counter, t0 is the largest T_i - n_i / PRF
/// over the records whose value lies within a tick and four pulses of the median of these values
/// (the others are corrupt clock readings, counted in a note). With thousands of records this finds
/// t0 within a few microseconds. When the archive states a scene time (centre or sensing start) and
/// the clock's t0 is more than one second off it, the scene time is used and a warning says so.
///
/// Failures (CImportFailure): 979205 when no PRI code of a product lies in the valid PRF band or
/// no SWST code in 500 .. 1500; 979206 when the clock goes backwards (more than one record in a
/// hundred off the median, the parameter naming the first record where the clock falls back);
/// 979209 when no product remains; 979210 when a product has no clock reading and the archive
/// states no scene time.
CLinePlan fqorvPlanLines(const std::vector<CRecordCodes>& theCodes, const CNativeArchive& theArchive);

/// Cuts a plan to the records [theFirst, theFirst + theCount) of the data file: lines of other
/// records and fill lines outside the stretch go, products outside it go; in each product that
/// remains the counters are renumbered from 1, and its first pulse time, pulses and record range
/// follow its first and last remaining lines. CImportFailure 979208 when the stretch holds no
/// record of the file, or no line of any product.
CLinePlan fqorvCutPlan(const CLinePlan& thePlan, int64_t theFirst, int64_t theCount);
