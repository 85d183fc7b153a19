// The line plan of an import: from the codes of every record of a data file to the lines of one
// or more raw products, each with the prefix codes the chain reads (line counter, window start,
// PRI code or slant range) and the time of its first pulse. Each sensor family has its own codes
// and the chain reads each family's lines in its own way; the plan follows both.
//
// What the chain handles itself is left in the lines as it is: lost lines (gaps of up to
// CQORV_CHAIN_GAP_LIMIT missing lines in the counter), repeated or overlapping records of ERS and
// ASAR (a counter that does not grow), window changes (ERS: SWST steps of a multiple of 22 codes;
// ASAR: any SWST step, in samples; ALOS: any change of the slant range of the first sample). What
// it cannot handle, the plan handles and says so in its notes:
//   - the 24-bit counter of ERS and ASAR wraps: counters are unwrapped and rewritten from 1 at each
//     product's start (ALOS line numbers do not wrap, and are rewritten from 1 as well);
//   - a gap longer than CQORV_CHAIN_GAP_LIMIT lines: fill lines are inserted (source -1), up to
//     CQORV_PLAN_MAX_FILL missing lines; a longer gap ends the product and starts another;
//   - a PRF change (a PRI code change; ALOS: a PRF change): it ends the product and starts another
//     (one PRF per product); an ALOS leader's PRF switch must agree with the records';
//   - ASAR's noise and calibration packets are no echoes: they are left out, and their pulses
//     become gaps of the counter like lost lines, so that the lines keep to the pulse grid;
//   - ALOS repeated or backward line numbers: the chain would keep them, the plan drops them;
//   - garbage codes: a counter that fits neither its neighbours, a PRI code outside the valid PRF
//     band or one that does not hold for CQORV_PLAN_PERSISTENCE records, a window code (a slant
//     range) that is implausible or does not hold as long, a missing ERS 0xAA marker (all codes of
//     the record suspect): each is replaced by the value in force;
//   - the clock: the time of the first pulse comes from the clock of all records, not from one
//     record's ticks (see fqorvPlanLines).
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

/// Records a PRF switch the ALOS leader states may lie from the records' own switch.
inline constexpr int CQORV_PLAN_SWITCH_TOLERANCE = 2;

/// One line of a raw product.
struct CPlannedLine {
    int64_t mSource = -1;     // record of the data file; -1: a fill line (no signal)
    uint32_t mCounter = 0;    // the line counter written into the prefix (1 at the product's first line)
    uint16_t mSwst = 0;       // the window start written: ERS a SWST code (4 samples), ASAR samples; ALOS 0
    uint16_t mPri = 0;        // the PRI code written at byte 60 (one per product): ERS and ASAR the
                              // product's code; ALOS the ERS-unit code of its PRF, which only the
                              // chain's PRF scan reads
    int32_t mRange = 0;       // ALOS: the slant range of the first sample written, m
    uint32_t mLength = 0;     // ASAR: the packet's bytes ...
    uint64_t mOffset = 0;     // ... and where it stands in the data file
    uint32_t mSamples = 0;    // ASAR: the complex samples its FBAQ blocks decode to
};

/// One raw product of an import.
struct CPlannedProduct {
    int64_t mFirstRecord = 0;         // the records of the data file it covers, first and last
    int64_t mLastRecord = 0;
    std::vector<CPlannedLine> mLines;
    int mPriCode = 0;                 // ERS: the PRI code; ASAR: the PRI in samples; ALOS: the PRF in mHz
    double mPrf = 0.0;                // Hz: ERS 1 / ((code + 2) * 210.94 ns), ASAR fs / code, ALOS code / 1000
    int mFirstSwst = 0;               // SWST code of the first line: the window start of the product
    int32_t mFirstRange = 0;          // ALOS: the slant range of the first line's first sample, m
    int mSamples = 0;                 // complex samples per line: the layout's; ASAR the most a line's packet holds
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

/// Plans the products of theCodes (every whole record of the data file, in file order) of theArchive,
/// by the rules of its family (theArchive.mFamily).
///
/// The time of a product's first pulse: every record's clock gives an instant T_i no later than its
/// pulse (ERS latches its clock up to four pulses before and counts in 1/256 s ticks; ASAR times
/// each packet in us, ALOS each record in whole ms), so with n_i the record's pulse index from the
/// product's first counter, t0 is the largest T_i - n_i / PRF over the records whose value lies
/// within a tick and the latch's pulses (at least one pulse) of the median of these values (the
/// others are corrupt clock readings, counted in a note). With thousands of records this finds
/// t0 within a few microseconds. When the archive states a scene time (centre or sensing start) and
/// the clock's t0 is more than one second off it, the scene time is used and a warning says so.
///
/// Failures (CImportFailure): 979205 when no PRI code of a product lies in the valid PRF band or
/// no window code (ALOS: slant range) is plausible and holds; 979206 when the clock goes backwards
/// (more than one record in a hundred off the median, the parameter naming the first record where
/// the clock falls back);
/// 979209 when no product remains; 979210 when a product has no clock reading and the archive
/// states no scene time; 979214 (ALOS) when the PRF switch the leader states lies more than
/// CQORV_PLAN_SWITCH_TOLERANCE lines from the records' (or the records hold none), or when the PRF
/// switches on the last line. The leader's switch line counts as the records' line numbers do (the
/// line number at byte 12, 1 for the first line): the number of the first line at the new PRF.
CLinePlan fqorvPlanLines(const std::vector<CRecordCodes>& theCodes, const CNativeArchive& theArchive);

/// Cuts a plan to the records [theFirst, theFirst + theCount) of the data file: lines of other
/// records and fill lines outside the stretch go, products outside it go; in each product that
/// remains the counters are renumbered from 1, and its first pulse time, pulses and record range
/// follow its first and last remaining lines. CImportFailure 979208 when the stretch holds no
/// record of the file, or no line of any product.
CLinePlan fqorvCutPlan(const CLinePlan& thePlan, int64_t theFirst, int64_t theCount);
