// Writers of native ERS raw archives from plain values: an ERS CEOS product directory and an ERS
// level-0 product in the ENVISAT format (.E1/.E2). The simulator writes its scenes through them,
// and the importer's tests build their fixtures with them.
//
// Both writers stream: the headers first, then one line record at a time, then finish() completes
// the counts of the headers with the records written and renames the archive into place. All is
// written under "<path>.part" (a directory for CEOS, a file for the ENVISAT format): an archive under
// its final name is complete, and a writer destroyed before finish() removes what it wrote.
// I/O failures throw std::runtime_error.
//
// Times are seconds from the midnight (UTC) of CSimNativeProduct::mReferenceDay, as in the import's
// archive model. All binary fields are big-endian; An/In/Fn are CEOS text fields of n characters
// (text left-justified, numbers right-justified, blank padded).
//
// ---- ERS CEOS: the directory holds VDF_DAT.001, LEA_01.001, DAT_01.001, NUL_DAT.001 -------------
// Every record starts with a 12-byte header: sequence number u32 @0 (1 for a file's first record),
// four type bytes @4, record length u32 @8.
//
// LEA_01.001 (28228 bytes with five state vectors):
//   @0      file descriptor, 720 bytes, types 63,192,18,18: "CEOS-SAR-CCT" @16; the count and length
//           (I6, I6) of the data set summary @180/186, of the platform position @204/210 and of the
//           facility records @420/426; the other record kinds of 192..359 count 0.
//   @720    data set summary, 1886 bytes, types 10,10,31,20:
//           68 A32 scene centre time "YYYYMMDDhhmmssttt" (ms) · 116/132 F16 centre latitude and
//           longitude (deg, longitude 0..360) · 396 A16 mission "ERS1"/"ERS2" · 412 A32
//           "SAR- C-HR-IM-" + polarisation · 444 A8 orbit · 484 F8 incidence at the centre (deg) ·
//           500 F16 wavelength (m) · 518 A16 "LINEAR FM CHIRP" · 646 F16 quadratic phase coefficient
//           K/2 (Hz/s) · 710 F16 sampling rate (MHz) · 726 F16 range gate delay (us) · 742 F16
//           pulse length (us) · 818/834 F16 I/Q bias · 934 F16 PRF (Hz) · 982 I16 satellite binary
//           time · 998 A32 its UTC "YYYYMMDDhhmmssttt" · 1046 A16 facility · 1062 A8 processor.
//           An absent value is a filler: "-9999999.9" for the I/Q bias, "-9999999.9999999" for the
//           range gate delay.
//   @2606   platform position, 386 + 132 n bytes (1046 for n = 5; never less), types 10,30,31,20:
//           140 I4 n · 144/148/152/156 I4 year, month, day, day of year of the first vector ·
//           160 F22 its seconds of day · 182 F22 interval (s) · 204 A64 "Earth Centred Rotating" ·
//           386 + 132 k: 6 x F22 x, y, z (m), vx, vy, vz (m/s) of vector k.
//   then    two facility records, 12288 bytes each, types 10,200,31,50 (blank).
// DAT_01.001:
//   @0      file descriptor of the layout's record length, types 63,192,18,18: 180 I6 records ·
//           186 I6 record length · 216/220/224 I4 bits per sample 8, samples per group 2, bytes per
//           group 2 · 236 I8 lines · 248 I8 complex samples per line · 276 I4 prefix bytes without
//           the 12-byte record header · 280 I8 sample bytes · 288 I4 suffix bytes ·
//           400 A28 "COMPLEX UNSIGNED INTEGER" · 428 A4 "CI*2".
//   then    one record per line, types 50,10,31,20, of the layout's record length: 12 u32 line
//           number (the record's, from 1) · 20/24/28 u32 left fill 0, samples, right fill 0 ·
//           the auxiliary block around the image format counter at C = the layout's counter
//           position: C-18 u8 packet counter, C-17 u8 subcommutation counter, C-8 u8 0xAA,
//           C-6 u32 on-board time (ICU), C u32 image format counter, C+4 u16 SWST code,
//           C+6 u16 PRI code · samples (I, Q bytes) from the layout's prefix · zero suffix.
//           All other prefix bytes are 0 (also 60..61).
// VDF_DAT.001: volume descriptor (192,192,18,18), a file pointer (219,192,18,18) for each of the
//   leader and the data file, a text record (18,63,18,18); 360 bytes each. NUL_DAT.001: one null
//   volume descriptor (192,192,63,18) of 360 bytes.
//
// ---- ENVISAT format: one file -------------------------------------------------------------------
//   @0      main product header, 1247 bytes of KEY=value lines (text in quotes, numbers signed and
//           zero padded with their unit in angle brackets, dates "DD-MMM-YYYY hh:mm:ss.uuuuuu"):
//           PRODUCT, PROC_CENTER, SOFTWARE_VER, SENSING_START, SENSING_STOP, ABS_ORBIT,
//           STATE_VECTOR_TIME, X/Y/Z_POSITION <m>, X/Y/Z_VELOCITY <m/s>, VECTOR_SOURCE,
//           UTC_SBT_TIME, SAT_BINARY_TIME, CLOCK_STEP=+3906250000<ps>, TOT_SIZE,
//           SPH_SIZE=+0000001956<bytes>, NUM_DSD=+0000000004, DSD_SIZE=+0000000280<bytes>, ...
//   @1247   specific product header, 1956 bytes: 836 bytes of KEY=value lines (TX_RX_POLAR="V/V",
//           ...), then four data set descriptors of 280 bytes: DS_NAME="SAR_SOURCE_PACKETS" (type M,
//           DS_OFFSET=+00000000000000003203<bytes>, DS_SIZE, NUM_DSR, DSR_SIZE=+0000011498<bytes>),
//           an orbit reference and two spare descriptors.
//   @3203   one record of 11498 bytes per line: 0 ISP sensing time (s32 days since 2000-01-01,
//           u32 s, u32 us) · 24 u16 ISP length 11465 · 32 u32 data record number · 36/37 u8 packet
//           and subcommutation counters · 46 u8 0xAA · 48 u32 satellite binary time · 52 u8 0xAA
//           (echo) · 54 u32 image format counter · 58 u16 SWST code · 60 u16 PRI code · 266 the
//           5616 I,Q byte pairs (a shorter line is padded with 15,16 pairs).
#pragma once

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "qorv_native_archive.h"
#include "qorv_sim_ceos.h"
#include "qorv_sim_orbit.h"

class CJson;

/// The record layouts of the ERS CEOS data file of the processing facilities.
enum class CSimCeosLayout { PgsVmp, Co, Eic, Ccrs, Asf };

struct CSimCeosVariant {
    const char* mName;          // "PGS/VMP", "CO", "EIC", "CCRS", "ASF" (the archive model's layout names)
    uint32_t mRecordLength;     // bytes of each line record and of the data file's descriptor
    int mPrefix;                // bytes before the samples, record header included
    int mCounterPos;            // the image format counter; the auxiliary block lies around it

    /// The most complex samples a line record holds.
    int capacity() const { return static_cast<int>(mRecordLength - static_cast<uint32_t>(mPrefix)) / 2; }
};

/// PGS/VMP 11644/412/210, CO 11644/416/214, EIC 11644/410/198, CCRS 12060/412/200, ASF 11474/242/200.
const CSimCeosVariant& fqorvSimCeosVariant(CSimCeosLayout theLayout);
/// "pgs" (or "vmp"), "co", "eic", "ccrs", "asf", any case; false for another name.
bool fqorvSimParseCeosLayout(const std::string& theName, CSimCeosLayout& theLayout);

/// Places of the auxiliary block's fields relative to the image format counter (CEOS and ENVISAT
/// format alike).
namespace NQORV_SIM_AUX {
inline constexpr int PACKET_COUNTER = -18;
inline constexpr int SUBCOMMUTATION = -17;
inline constexpr int MARKER = -8;
inline constexpr int CLOCK = -6;
inline constexpr int SWST = 4;
inline constexpr int PRI = 6;
}  // namespace NQORV_SIM_AUX

/// ENVISAT-format sizes of ERS level 0.
namespace NQORV_SIM_ENVISAT {
inline constexpr int MPH_SIZE = 1247;
inline constexpr int SPH_SIZE = 1956;
inline constexpr int SPH_FIXED = 836;           // KEY=value part before the descriptors
inline constexpr int DSD_SIZE = 280;
inline constexpr int NUM_DSD = 4;
inline constexpr int DATA_OFFSET = MPH_SIZE + SPH_SIZE;   // 3203
inline constexpr int RECORD_SIZE = 11498;
inline constexpr int ISP_LENGTH = RECORD_SIZE - 33;       // 11465
inline constexpr int COUNTER_POS = 54;
inline constexpr int SAMPLES_POS = 266;
inline constexpr int SAMPLES = (RECORD_SIZE - SAMPLES_POS) / 2;   // 5616
inline constexpr long MJD2000_DAY = 10957;      // 2000-01-01 in days since 1970-01-01
}  // namespace NQORV_SIM_ENVISAT

enum class CSimNativeFormat { Ceos, Envisat };

/// What an archive states, as plain values. NaN: the value is absent (CEOS writes its filler).
struct CSimNativeProduct {
    // Identity.
    std::string mSensor = "ERS-2";             // "ERS-1" or "ERS-2"
    CSimCeosLayout mLayout = CSimCeosLayout::PgsVmp;
    std::string mFacility = "D-PAF";           // CEOS leader; ENVISAT format: PROC_CENTER
    std::string mProcessor = "PGS-ERS";        // CEOS leader; ENVISAT format: SOFTWARE_VER
    int mOrbit = 0;                            // absolute orbit
    std::string mPolarisation = "VV";
    long mReferenceDay = 0;                    // days since 1970-01-01 that every time here counts from

    // Lines.
    int mSamples = 5616;                       // complex samples per line: at most the CEOS layout's
                                               // capacity, at most 5616 in the ENVISAT format
    long mDeclaredLines = -1;                  // lines the descriptors state; -1: the records written

    // Radar values of the CEOS leader (the ENVISAT format states none).
    double mWavelength = NAN;                  // m
    double mChirpRate = NAN;                   // Hz/s; the leader holds K/2
    double mSamplingRate = NAN;                // Hz; the leader holds MHz
    double mPulseLength = NAN;                 // s; the leader holds us
    double mPrf = NAN;                         // Hz
    double mIBias = NAN, mQBias = NAN;         // mean I and Q code
    double mRangeGateDelay = NAN;              // s

    // The scene.
    double mCentreTime = NAN;                  // CEOS leader, written to the ms
    double mCentreLatitude = NAN;              // deg
    double mCentreLongitude = NAN;             // deg, -180 .. 360
    double mIncidenceDeg = NAN;
    double mSensingStart = NAN;                // ENVISAT MPH; NaN: the sensing time of the first record
    double mSensingStop = NAN;                 // ... and of the last record

    // The on-board clock's reference pair (CEOS leader 982/998, ENVISAT SAT_BINARY_TIME and
    // UTC_SBT_TIME). The CEOS text holds ms: put the reference time on a whole ms.
    CNativeClock mClock;

    // Earth-fixed state vectors: CEOS writes all of them (equally spaced) into the platform position
    // record; the ENVISAT format writes the first one into the main product header.
    std::vector<CStateVector> mStateVectors;
    std::string mVectorSource = "FP";          // ENVISAT VECTOR_SOURCE
};

/// The codes of one line record.
struct CSimNativeLine {
    uint32_t mCounter = 0;          // image format counter, all 32 bits as given (the low 24 count)
    uint32_t mClock = 0;            // on-board time: ICU (CEOS), satellite binary time (ENVISAT)
    uint16_t mSwst = 0;             // SWST code
    uint16_t mPri = 0;              // PRI code
    uint8_t mMarker = NQORV_ERS::MARKER;   // the fixed byte (give another value to corrupt it)
    uint8_t mPacketCounter = 0;
    uint8_t mSubcommutation = 0;
    uint32_t mRecordNumber = 0;     // ENVISAT data record number (CEOS numbers its records itself)
    double mSensingTime = NAN;      // ENVISAT ISP sensing time; NaN: the clock's UTC of mClock
};

/// A native archive being written.
class CSimNativeWriter {
public:
    virtual ~CSimNativeWriter() = default;
    /// Appends one line record; theSamples holds mSamples I,Q byte pairs.
    virtual void writeLine(const CSimNativeLine& theLine, const uint8_t* theSamples) = 0;
    /// Completes the headers with the records written and renames the archive into place; returns
    /// its final path. A line written after finish() is a logic error.
    virtual std::filesystem::path finish() = 0;
    /// Records written so far.
    long records() const { return mRecords; }

protected:
    long mRecords = 0;
};

/// Opens a writer. CEOS: thePath is the product directory (written as "<thePath>.part", whose
/// four files replace those of an earlier product of thePath; other files in thePath are an
/// error). ENVISAT format: thePath is the file. Throws std::runtime_error when a value does not fit
/// its format (samples beyond the capacity, fewer than 2 state vectors for CEOS, none for the
/// ENVISAT format) or a file can't be created.
std::unique_ptr<CSimNativeWriter> fqorvSimOpenNativeWriter(CSimNativeFormat theFormat, const CSimNativeProduct& theProduct,
                                                           const std::filesystem::path& thePath);

/// A simulated orbit state as an archive's state vector at theTime (s from the reference day).
CStateVector fqorvSimStateVector(const CSimState& theState, double theTime);

/// The truth file's "state_vectors" of theVectors: times less theOffset (s from the scene's epoch
/// when theOffset is the epoch's seconds from the vectors' midnight), positions, velocities.
CJson fqorvSimVectorsJson(const std::vector<CStateVector>& theVectors, double theOffset, const std::string& theSource);

/// The ENVISAT product name of a product: "SAR_IM__0P" ... ".E2" (".E1" for ERS-1), 62 characters,
/// from the sensing start, its duration and the orbit.
std::string fqorvSimEnvisatProductName(const CSimNativeProduct& theProduct, double theSensingStart,
                                       double theSensingStop);

// ---- Pieces every writer of ENVISAT-format files shares -----------------------------------------

/// A file written from its start (under a ".part" name, by the caller's choice), with fields
/// patched in place at the end: the CEOS writers' part file.
using CSimPartFile = NQORV_SIM_CEOS::CPartFile;

/// "DD-MMM-YYYY hh:mm:ss.uuuuuu" of a time in s from the midnight of theDay (days since 1970-01-01).
std::string fqorvSimEnvisatDate(long theDay, double theSeconds);
/// KEY="text" (the text cut or blank padded to theWidth) and a line end.
std::string fqorvSimEnvisatText(const char* theKey, const std::string& theText, std::size_t theWidth);
/// KEY=+000123<unit>: a signed whole number of theDigits digits and a line end.
std::string fqorvSimEnvisatNumber(const char* theKey, long long theValue, int theDigits, const char* theUnit = "");
/// A header text completed with a line of blanks to theSize bytes; std::runtime_error when longer.
std::string fqorvSimEnvisatPadded(const std::string& theText, std::size_t theSize);
/// A data set descriptor of NQORV_SIM_ENVISAT::DSD_SIZE bytes (DS_NAME, DS_TYPE, FILENAME,
/// DS_OFFSET, DS_SIZE, NUM_DSR, DSR_SIZE).
std::string fqorvSimEnvisatDescriptor(const char* theName, char theType, const std::string& theFile,
                                      unsigned long long theOffset, unsigned long long theSize, long theCount,
                                      long theRecordSize);

/// What a main product header states beyond the product's values.
struct CSimEnvisatMph {
    std::string mName;                        // PRODUCT, up to 62 characters
    double mStart = NAN, mStop = NAN;         // SENSING_START and _STOP, s from the reference day
    unsigned long long mTotalSize = 0;        // TOT_SIZE, bytes
    int mSphSize = NQORV_SIM_ENVISAT::SPH_SIZE;
    int mNumDsd = NQORV_SIM_ENVISAT::NUM_DSD;
    int mNumDataSets = 1;
};
/// The main product header (NQORV_SIM_ENVISAT::MPH_SIZE bytes) of a product: its identity, clock
/// and first state vector (zeros and a blank VECTOR_SOURCE when it has none).
std::string fqorvSimEnvisatMainHeader(const CSimNativeProduct& theProduct, const CSimEnvisatMph& theHeader);
/// An ENVISAT file name: theType (10 characters, "SAR_IM__0P"), "X", the first three letters of the
/// facility, the start (date and time to the second), the duration (s), the orbit, theExtension.
std::string fqorvSimEnvisatName(const std::string& theType, const CSimNativeProduct& theProduct, double theStart,
                                double theStop, const std::string& theExtension);
/// A record's sensing time at theOut: days since 2000-01-01 (s32), second of the day (u32) and
/// microseconds (u32) of a time in s from the midnight of theDay, rounded to the microsecond.
void fqorvSimPutMjd2000(uint8_t* theOut, long theDay, double theSeconds);

// ---- The simulator's scenes as native archives --------------------------------------------------

class CJson;
class CSimOrbit;
class CSimTimeline;
struct CSimRecord;
struct CSimScene;
struct CSimSceneTruth;

/// The simulated on-board clock of a completed scene, times in s from the midnight of the scene's
/// epoch day: a 32-bit count of 1/256 s ticks whose reference pair lies about 1500 s before the
/// first pulse, its UTC on a whole millisecond and on a tick edge (so the leader's millisecond text
/// is exact).
CNativeClock fqorvSimSceneClock(const CSimScene& theScene, const CSimTimeline& theTimeline);
/// The clock's count at theTime (s from the same midnight): the tick edge at or before it.
uint32_t fqorvSimClockTicks(const CNativeClock& theClock, double theTime);

/// What the archive of a completed scene states: the scene's radar values, the truth's scene
/// centre, the clock, and the state vectors (CEOS: five, spanning the scene with one vector of
/// margin at each end; ENVISAT format: one, at the scene centre's time to the microsecond).
CSimNativeProduct fqorvSimSceneProduct(const CSimScene& theScene, const CSimTimeline& theTimeline,
                                       const CSimOrbit& theOrbit, const CSimSceneTruth& theTruth);

/// The codes of one record: the low 24 bits of the line counter, the clock latched at the latest
/// pulse whose index is a multiple of 4, the window and PRI codes of the pulse, and the scene's
/// garbage for that pulse.
CSimNativeLine fqorvSimSceneLine(const CSimScene& theScene, const CSimTimeline& theTimeline, const CNativeClock& theClock,
                                 const CSimRecord& theRecord);

/// The archive's path for an output root: the directory theRoot (CEOS), or theRoot.E2 (.E1 for
/// ERS-1).
std::filesystem::path fqorvSimArchivePath(const CSimScene& theScene, const std::string& theRoot);

/// Adds to a scene's truth file what the archive holds: its format and layout, the clock, the
/// window grid, the state vectors written, and the garbage written into records (events.garbage).
void fqorvSimAddArchiveTruth(CJson& theTruth, const CSimScene& theScene, const CSimTimeline& theTimeline,
                             const CSimNativeProduct& theProduct, const std::filesystem::path& theArchive);
