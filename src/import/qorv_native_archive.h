// What a reader learns of a native raw archive: its identity, the radar values it states, its
// clock, its orbit, and where each line record's fields stand. A reader fills it from the archive
// alone (NaN where the archive states no value); the line plan and the writer of raw products work
// from it, never from the archive's own tables.
//
// Times are seconds from the midnight (UTC) of mReferenceDay. All record fields are big-endian.
#pragma once

#include <cmath>
#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "qorv_state_vectors.h"

/// Values of the ERS-1/2 image mode that the archives do not always state, and the units of the
/// codes in every ERS line.
namespace NQORV_ERS {
inline constexpr double CARRIER = 5.3e9;                 // Hz, nominal
inline constexpr double SAMPLING_RATE = 18.962468e6;     // Hz
inline constexpr double CHIRP_RATE = 4.17788e11;         // Hz/s, up chirp
inline constexpr double PULSE_LENGTH = 37.12e-6;         // s
inline constexpr double IQ_BIAS = 15.5;                  // mean of a 5-bit I or Q code
inline constexpr double PRI_UNIT = 210.94e-9;            // s: PRI = (code + PRI_OFFSET) * PRI_UNIT
inline constexpr int PRI_OFFSET = 2;
inline constexpr double PRF_MIN = 1640.0;                // Hz, the valid band of the PRI code
inline constexpr double PRF_MAX = 1720.0;
inline constexpr int SWST_SAMPLES_PER_CODE = 4;          // one SWST code = 4 samples (4 / fs)
inline constexpr int SWST_MIN = 500;                     // valid SWST codes
inline constexpr int SWST_MAX = 1500;
inline constexpr int SWST_STEP = 22;                     // window changes come in multiples of 22 codes
inline constexpr int RANK = 9;                           // pulses in flight between a pulse and its echo
inline constexpr double DELAY_BIAS = 6.622e-6;           // s, taken off the window start delay
inline constexpr double CLOCK_TICK = 1.0 / 256.0;        // s, LSB of the on-board and binary clocks
inline constexpr int COUNTER_BITS = 24;                  // the image format counter counts in 24 bits
inline constexpr uint8_t MARKER = 0xAA;                  // fixed byte of the auxiliary block
}  // namespace NQORV_ERS

/// The on-board clock of an archive: the UTC of a tick count c is
/// mReferenceTime + (c - mReferenceTicks) * mTickSeconds, the difference taken as a signed 32-bit
/// number (the counter wraps).
struct CNativeClock {
    double mReferenceTime = NAN;     // s from the reference day: the UTC at which the clock read mReferenceTicks
    uint32_t mReferenceTicks = 0;
    double mTickSeconds = NQORV_ERS::CLOCK_TICK;

    double timeOf(uint32_t theTicks) const
    {
        return mReferenceTime + static_cast<double>(static_cast<int32_t>(theTicks - mReferenceTicks)) * mTickSeconds;
    }
};

/// Where the line records stand in the data file and where each record's fields stand in it.
/// Records have one length; each states its own length in a field, which the walk checks.
struct CNativeRecordLayout {
    std::filesystem::path mDataFile;
    uint64_t mFirstRecord = 0;       // byte offset of record 0
    uint32_t mRecordLength = 0;      // bytes per record, as the descriptor states
    int mLengthPos = 8;              // the record's own length field: CEOS u32 at 8 ...
    int mLengthBytes = 4;            // ... ENVISAT format: the ISP length, u16 at 24 ...
    int mLengthAdd = 0;              // ... plus 33: record length = field + mLengthAdd
    uint32_t mSamplesPos = 0;        // byte of the first I,Q pair in a record
    int mSamples = 0;                // complex samples per line (one I and one Q byte each)
    uint64_t mDeclaredRecords = 0;   // lines the descriptor declares
    uint64_t mRecords = 0;           // whole records the file holds
    // The auxiliary (IDHT) block: the same fields in the same order in every ERS layout.
    int mCounterPos = 210;           // u32 image format counter (low 24 bits)
    int mClockPos = 204;             // u32 on-board time (ICU in CEOS, satellite binary time in the ENVISAT format)
    int mSwstPos = 214;              // u16 sampling window start code
    int mPriPos = 216;               // u16 pulse repetition interval code
    int mMarkerPos = 202;            // u8 fixed 0xAA
    int mAuxPos = 192;               // first byte of the 26-byte auxiliary block (packet counter)
};

/// The codes of one record, as read.
struct CRecordCodes {
    uint32_t mCounter = 0;           // the 32 bits at mCounterPos
    uint32_t mClock = 0;
    uint16_t mSwst = 0;
    uint16_t mPri = 0;
    bool mMarker = false;            // the 0xAA byte is in place
};

struct CNativeArchive {
    std::string mFormat;                      // "ERS CEOS" or "ERS ENVISAT format"
    std::filesystem::path mSource;            // as the user named it
    std::vector<std::filesystem::path> mFiles;   // the files read
    std::string mSensor;                      // "ERS-1" or "ERS-2"
    std::string mLayoutName;                  // the variant of the record layout: "PGS/VMP", "CO", "EIC", "CCRS", "ASF", "ENVISAT format"
    std::string mFacility;                    // CEOS "D-PAF", "ESRIN", ...; ENVISAT format: the processing centre
    std::string mProcessor;                   // "PGS-ERS", "VMP", ...; ENVISAT format: the software version
    std::string mProductName;                 // the archive's own name for the product, "" when none
    int mOrbit = -1;                          // absolute orbit, -1 when the archive gives none
    std::string mPolarisation = "VV";
    long mReferenceDay = 0;                   // days since 1970-01-01 that every time here counts from

    // Radar values as stated; NaN where the archive states none (the format's constant then serves).
    double mWavelength = NAN;                 // m
    double mSamplingRate = NAN;               // Hz
    double mChirpRate = NAN;                  // Hz/s, signed (positive: up chirp)
    double mPulseLength = NAN;                // s
    double mPrf = NAN;                        // Hz, as stated beside the codes
    double mIBias = NAN, mQBias = NAN;        // mean code of I and Q

    // The scene as stated; NaN where absent.
    double mCentreTime = NAN;                 // s from the reference day
    double mSensingStart = NAN;               // s from the reference day
    double mCentreLatitude = NAN, mCentreLongitude = NAN;   // deg, longitude in -180 .. 180
    double mIncidenceDeg = NAN;               // at the scene centre

    CNativeClock mClock;
    std::vector<CStateVector> mStateVectors;  // Earth-fixed, times from the reference day
    std::string mStateVectorSource;           // "leader", "main product header (FP)", ...

    CNativeRecordLayout mLayout;
    bool mTruncated = false;                  // the data file holds fewer whole records than declared
    std::vector<std::string> mNotes;          // what the reader found and how it took it, for the report
};
