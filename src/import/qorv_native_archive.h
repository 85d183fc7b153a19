// What a reader learns of a native raw archive: its identity, the radar values it states, its
// clock, its orbit, and where each line record's fields stand. A reader fills it from the archive
// alone (NaN where the archive states no value); the line plan and the writer of raw products work
// from it, never from the archive's own tables.
//
// Three sensor families, each with its own line codes: ERS-1/2 (CEOS and ENVISAT format: an
// auxiliary block with a 24-bit counter, a 1/256 s clock, SWST and PRI codes), ENVISAT ASAR image
// mode (ENVISAT format: packets of their own lengths, a 24-bit packet count, a microsecond sensing
// time, SWST and PRI codes in samples, FBAQ 4-bit samples) and ALOS PALSAR level 1.0 (CEOS: a
// 32-bit line number, a time of day in ms, the PRF in mHz and the slant range of the first sample
// in every record).
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

/// Values of the ENVISAT ASAR image mode the packets and the instrument file do not carry.
namespace NQORV_ASAR {
inline constexpr double PRF_MIN = 1600.0;                // Hz, the valid band of the PRI code (fs / code)
inline constexpr double PRF_MAX = 2200.0;
inline constexpr double BANDWIDTH_UNIT = 16e6 / 255.0;   // Hz per step of the chirp bandwidth code
inline constexpr int COUNTER_BITS = 24;                  // the mode packet count
inline constexpr double CLOCK_TICK = 1e-6;               // s, the packets' sensing time in microseconds
inline constexpr int INSTRUMENT_FILE_SIZE = 171648;      // bytes of the instrument file's data set
}  // namespace NQORV_ASAR

/// Values of ALOS PALSAR level 1.0 (FBS and FBD).
namespace NQORV_ALOS {
inline constexpr double PRF_MIN = 1000.0;                // Hz; polarimetric products (PLR) alternate
inline constexpr double PRF_MAX = 3000.0;                // polarisations pulse by pulse above 3000 Hz
inline constexpr double IQ_BIAS = 15.5;
inline constexpr double CLOCK_TICK = 1e-3;               // s, the records' time of day in whole ms
}  // namespace NQORV_ALOS

/// The sensor families the importers read.
enum class ENativeFamily { Ers, Asar, Alos };

/// The clock of an archive's line records: the UTC of a reading c is
/// mReferenceTime + (c - mReferenceTicks) * mTickSeconds, the difference taken as a signed 32-bit
/// number when the clock is a wrapping 32-bit counter (ERS), as it stands otherwise. A reading is
/// never later than its pulse and may lag it by up to mLatchPulses pulses plus one tick.
struct CNativeClock {
    double mReferenceTime = NAN;     // s from the reference day: the UTC at which the clock read mReferenceTicks
    int64_t mReferenceTicks = 0;
    double mTickSeconds = NQORV_ERS::CLOCK_TICK;
    bool mWraps32 = true;            // ERS on-board and binary times; the ASAR and ALOS times do not wrap
    int mLatchPulses = 4;            // ERS latches its clock every fourth pulse; ASAR and ALOS every pulse (0)

    double timeOf(int64_t theTicks) const
    {
        const int64_t d = mWraps32 ? static_cast<int64_t>(static_cast<int32_t>(static_cast<uint32_t>(theTicks - mReferenceTicks)))
                                   : theTicks - mReferenceTicks;
        return mReferenceTime + static_cast<double>(d) * mTickSeconds;
    }
};

/// Where the line records stand in the data file and where each record's fields stand in it.
/// ERS and ALOS records have one length; each states its own length in a field, which the walk
/// checks. ASAR packets have lengths of their own (mVariable): the walk goes by each one's.
struct CNativeRecordLayout {
    ENativeFamily mFamily = ENativeFamily::Ers;
    bool mVariable = false;          // ASAR: every packet of its own length (ISP length at 24, + 39)
    std::filesystem::path mDataFile;
    uint64_t mFirstRecord = 0;       // byte offset of record 0
    uint32_t mRecordLength = 0;      // bytes per record, as the descriptor states
    int mLengthPos = 8;              // the record's own length field: CEOS u32 at 8 ...
    int mLengthBytes = 4;            // ... ENVISAT format: the ISP length, u16 at 24 ...
    int mLengthAdd = 0;              // ... plus 33: record length = field + mLengthAdd
    uint32_t mSamplesPos = 0;        // byte of the first I,Q pair in a record (ASAR: of the first FBAQ block)
    int mSamples = 0;                // complex samples per line (one I and one Q byte each; ASAR: the
                                     // most any echo packet holds; ALOS: the data pixels at 24)
    uint32_t mSuffix = 0;            // bytes behind the samples (ALOS: right-fill pixels)
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
    uint32_t mCounter = 0;           // ERS: the 32 bits at mCounterPos; ASAR: the mode packet count; ALOS: the line number
    int64_t mClock = 0;              // ERS: the on-board ticks; ASAR: us since 2000-01-01; ALOS: ms since the reference day
    uint16_t mSwst = 0;              // ERS: code (4 samples); ASAR: samples; ALOS: 0
    uint16_t mPri = 0;               // ERS: code (210.94 ns); ASAR: samples (fs / code is the PRF); ALOS: 0
    bool mMarker = false;            // the record's codes can be trusted (ERS: the 0xAA byte; ASAR, ALOS: always)
    bool mEcho = true;               // an echo: ASAR's noise and calibration packets are not
    uint32_t mPrfMilliHz = 0;        // ALOS: the PRF the record states
    int32_t mRange = 0;              // ALOS: slant range of the first sample, m
    uint64_t mOffset = 0;            // ASAR: byte of the packet in the data file
    uint32_t mLength = 0;            // ASAR: bytes of the packet
    uint32_t mSamples = 0;           // ASAR: complex samples the packet holds; ERS, ALOS: the layout's
};

/// The FBAQ decoding tables of an ASAR instrument file: the value of the 4-bit code v of a block
/// whose block id is b is mI[256 m + b] (and mQ for Q), m = 15 - v for v of 8 and above, 8 + v
/// below.
struct CFbaqTables {
    std::vector<float> mI, mQ;       // 4096 values each
};

struct CNativeArchive {
    ENativeFamily mFamily = ENativeFamily::Ers;
    std::string mFormat;                      // "ERS CEOS", "ERS ENVISAT format", "ASAR ENVISAT format", "ALOS CEOS level 1.0"
    std::filesystem::path mSource;            // as the user named it
    std::vector<std::filesystem::path> mFiles;   // the files read (outside files included)
    std::string mSensor;                      // "ERS-1", "ERS-2", "ENVISAT-1" or "ALOS_PALSAR"
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
    double mBandwidth = NAN;                  // Hz, chirp bandwidth where stated (ASAR code, ALOS calibration record)
    double mCarrier = NAN;                    // Hz, where stated as a frequency (ASAR instrument file)

    // ASAR: what the instrument file and the packets give.
    double mRangeGateBias = NAN;              // s, taken off the window start delay
    int mRank = -1;                           // pulses in flight, from the instrument file's timeline for the beam set
    int mBeamSet = -1;                        // of the echo packets (IS1 .. IS7)
    CFbaqTables mFbaq;

    // ALOS: the product kind and the PRF switch the leader states.
    std::string mOriginData;                  // "ALOS_PALSAR_FBS10" or "ALOS_PALSAR_FBD10"
    int64_t mPrfSwitchLine = -1;              // the line where the PRF changes, -1 when the leader states none

    // The scene as stated; NaN where absent.
    double mCentreTime = NAN;                 // s from the reference day
    double mSensingStart = NAN;               // s from the reference day
    double mCentreLatitude = NAN, mCentreLongitude = NAN;   // deg, longitude in -180 .. 180
    double mIncidenceDeg = NAN;               // at the scene centre

    CNativeClock mClock;
    std::vector<CStateVector> mStateVectors;  // Earth-fixed, times from the reference day
    std::string mStateVectorSource;           // "leader", "main product header (FP)", an orbit file ...

    CNativeRecordLayout mLayout;
    bool mTruncated = false;                  // the data file holds fewer whole records than declared
    std::vector<std::string> mNotes;          // what the reader found and how it took it, for the report
};
