// ENVISAT ASAR image mode level 0 as the simulator writes it: the product (ROOT.N1) with its echo,
// noise and calibration packets, its instrument file (ROOT_ASA_INS_AX) and a DORIS-style orbit file
// (ROOT_DOR_VOR_AX); the FBAQ 8:4 encoder whose tables the instrument file carries. Plain values
// in, so that tests can write products of their own values.
//
// Times are seconds from the midnight (UTC) of CSimNativeProduct::mReferenceDay. All binary fields
// are big-endian. Each file is written under "<name>.part" and renamed into place when complete.
//
// ---- The product (.N1) --------------------------------------------------------------------------
//   @0      main product header, 1247 bytes (as the .E2 product's: PRODUCT="ASA_IM__0P...N1", the
//           sensing start and stop of the first and last packet, one state vector "FP", the
//           clock's reference pair), SPH_SIZE 1956, NUM_DSD 4.
//   @1247   specific product header, 1956 bytes: KEY=value lines with TX_RX_POLAR ("V/V  ", the
//           value at SPH+775) and SWATH ("IS2", at SPH+789), then four data set descriptors:
//           ASAR_SOURCE_PACKETS (M, DS_OFFSET 3203, DS_SIZE, NUM_DSR, DSR_SIZE -1: every packet of
//           its own length) and the references CONFIGURATION_FILE, INSTRUMENT_CHAR_FILE (the
//           instrument file's product name) and ORBIT_STATE_VECTOR_FILE (the orbit file's).
//   @3203   packets of 39 + L bytes, L the ISP length:
//           0 sensing time: s32 days since 2000-01-01, u32 s of the day, u32 us (the pulse's
//           transmit time, truncated to the us) · 12 the same as the reception time · 24 u16 L ·
//           34 u16 sequence control (0xC000 | packet index in the file, 14 bits) · 36 u16 L ·
//           38 u16 data field header length 29 · 40 u16 mode id 0x54 (image mode) ·
//           48 24-bit mode packet count (every packet counts) · 51 beam set << 2 | 1 (FBAQ 8:4) ·
//           52 u16 flags << 8: 0x80 echo, 0x40 noise, 0x20 calibration · 54 u16 PRI code (fs / PRF,
//           samples) · 56 u16 SWST code (samples) · 58 u16 window length (samples) · 60 u16 tx
//           polarisation bit 6, rx bit 5 (1: V) · 62 u16 pulse length code tau fs << 6 ·
//           64 u8 chirp bandwidth code B / (16 MHz / 255) · 68 the FBAQ blocks, L + 1 - 30 bytes.
//
// ---- The instrument file (ASA_INS_AX) ------------------------------------------------------------
//   An ENVISAT-format product: main product header (PRODUCT="ASA_INS_AX...", SENSING_START/STOP its
//   validity: the days around the scene), a 378-byte specific product header with one descriptor,
//   then the data set at 1247 + 378, NQORV_ASAR::INSTRUMENT_FILE_SIZE bytes, zero but for
//   (qorv_asar_instrument.h): float radar frequency @16, float sampling rate @20, float range gate
//   bias (s) @69912, FBAQ I table @74656, Q table @103328 (4096 floats each, the same values), the
//   image mode timeline @161594: 4 x 7 u16 rows swath (1 .. 7), m (0), r (rank), g (0) of the beam
//   sets IS1 .. IS7.
//
// ---- The orbit file (DOR_VOR_AX) -----------------------------------------------------------------
//   Main product header (PRODUCT="DOR_VOR_AX...", SENSING_START/STOP its first and last vector), a
//   378-byte specific product header with one descriptor, then records of 129 bytes: 128 characters
//   "DD-MMM-YYYY hh:mm:ss.uuuuuu dUT1 x y z vx vy vz quality" (blank separated; s, m with 3 and m/s
//   with 6 decimals, Earth-fixed), blank padded, and '\n'.
#pragma once

#include <array>
#include <complex>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "qorv_native_archive.h"
#include "qorv_sim_native.h"

/// Places and values of the ASAR files.
namespace NQORV_SIM_ASAR {
inline constexpr int PACKET_HEADER = 68;        // bytes before the FBAQ blocks
inline constexpr int PACKET_OVERHEAD = 39;      // packet bytes = ISP length + 39
inline constexpr int FIELD_HEADER = 29;         // data field header length; blocks = L + 1 - 30 bytes
inline constexpr uint16_t MODE_IM = 0x54;
inline constexpr uint8_t ECHO = 0x80, NOISE = 0x40, CALIBRATION = 0x20;
inline constexpr int ISP_LENGTH_POS = 24, SEQUENCE_POS = 34, PACKET_LENGTH_POS = 36, FIELD_HEADER_POS = 38,
                     MODE_POS = 40, COUNT_POS = 48, BEAM_POS = 51, FLAGS_POS = 52, PRI_POS = 54, SWST_POS = 56,
                     WINDOW_POS = 58, POLARISATION_POS = 60, PULSE_POS = 62, BANDWIDTH_POS = 64;
inline constexpr int SMALL_SPH_SIZE = 378;      // specific product header of the instrument and orbit files
inline constexpr int POLAR_POS = 775, SWATH_POS = 789;   // values in the product's specific header
inline constexpr int INS_FREQUENCY = 16, INS_SAMPLING_RATE = 20, INS_RANGE_GATE_BIAS = 69912, INS_FBAQ_I = 74656,
                     INS_FBAQ_Q = 103328, INS_TIMELINE = 161594;
inline constexpr int ORBIT_RECORD = 129;
inline constexpr double ORBIT_STEP = 60.0;      // s between the orbit file's vectors
inline constexpr double ORBIT_MARGIN = 300.0;   // s the orbit file reaches beyond the scene
inline constexpr float RANGE_GATE_BIAS = 1.0e-6f;   // s, as the instrument file states it
}  // namespace NQORV_SIM_ASAR

// ---- FBAQ 8:4 -----------------------------------------------------------------------------------

/// The simulator's FBAQ 8:4 code book. Level m (0 .. 15, ascending) of block id b is
/// gain(b) x L(m), L the 16 levels of the Lloyd-Max quantiser of a unit Gaussian and gain(b) =
/// 2^(-10 + 16 b / 255): 256 gains spaced logarithmically from 2^-10 to 2^6 of the scene's
/// component rms (to which the encoder's scale brings the samples), 0.33 dB apart. I and Q share
/// the tables.
class CSimFbaqEncoder {
public:
    CSimFbaqEncoder();
    /// The tables as the instrument file holds them (float).
    const CFbaqTables& tables() const { return mTables; }
    /// Gain of block id b.
    static double blockGain(int theId);
    /// Encodes n complex samples times theScale into FBAQ blocks (fqorvSimFbaqBytes(n) bytes at
    /// theOut): per block the id whose gain is nearest (in log) to the block's component rms, then
    /// each component to the nearest level of that block. theValues (2 n floats, I and Q), when
    /// given, receives the table values chosen. Returns the components beyond the outermost
    /// decision level.
    long encode(const std::complex<double>* theIn, int n, double theScale, uint8_t* theOut,
                float* theValues = nullptr) const;

private:
    CFbaqTables mTables;
};

/// The one code book of the simulator.
const CSimFbaqEncoder& fqorvSimFbaqEncoder();
/// Bytes of the FBAQ blocks of n complex samples: 64 per 63 samples, one more than the samples for
/// a last shorter block.
int fqorvSimFbaqBytes(int theSamples);

// ---- The files ----------------------------------------------------------------------------------

/// What the ASAR files state beyond the product's values (CSimNativeProduct).
struct CSimAsarValues {
    int mBeamSet = 2;                          // IS1 .. IS7
    std::array<int, 7> mRanks{};               // rank (pulses in flight) of each beam set
    double mCarrier = 5.331e9;                 // Hz, written as float
    double mSamplingRate = 19.20768e6;         // Hz, written as float
    float mRangeGateBias = NQORV_SIM_ASAR::RANGE_GATE_BIAS;
    int mPulseCode = 0;                        // pulse length x fs
    int mBandwidthCode = 255;                  // chirp bandwidth / (16 MHz / 255)
    double mValidityStart = NAN, mValidityStop = NAN;   // the instrument file's
    std::string mInstrumentName, mOrbitName;   // product names the .N1 descriptors refer to
};

/// The codes of one packet.
struct CSimAsarPacket {
    uint8_t mFlags = NQORV_SIM_ASAR::ECHO;
    uint32_t mCount = 0;                       // mode packet count (the low 24 bits are written)
    double mSensingTime = NAN;                 // s from the reference day, truncated to the us
    uint16_t mPri = 0, mSwst = 0;              // samples
};

/// The .N1 product being written, packet by packet.
class CSimAsarWriter {
public:
    /// Opens "<thePath>.part". std::runtime_error when it can't be created.
    CSimAsarWriter(const CSimNativeProduct& theProduct, const CSimAsarValues& theValues, const std::filesystem::path& thePath);
    ~CSimAsarWriter();
    CSimAsarWriter(const CSimAsarWriter&) = delete;
    CSimAsarWriter& operator=(const CSimAsarWriter&) = delete;

    /// Appends one packet: theBytes of FBAQ blocks (fqorvSimFbaqBytes(samples)).
    void writePacket(const CSimAsarPacket& thePacket, const uint8_t* theBlocks, int theBytes);
    /// Completes the headers with the packets written and renames the product into place.
    std::filesystem::path finish();
    long packets() const { return mPackets; }

private:
    std::string specificHeader(unsigned long long theDataSize) const;

    CSimNativeProduct mProduct;
    CSimAsarValues mValues;
    std::filesystem::path mPath, mPart;
    std::unique_ptr<CSimPartFile> mFile;
    std::vector<uint8_t> mPacket;
    unsigned long long mDataSize = 0;
    long mPackets = 0;
    double mFirstTime = NAN, mLastTime = NAN;
    bool mFinished = false;
};

/// Writes the instrument file to thePath (through "<thePath>.part"), with the code book's tables.
void fqorvSimWriteAsarInstrument(const CSimNativeProduct& theProduct, const CSimAsarValues& theValues,
                                 const CFbaqTables& theTables, const std::filesystem::path& thePath);

/// Writes an orbit file of theVectors (Earth-fixed, times from the product's reference day).
void fqorvSimWriteDorisOrbit(const CSimNativeProduct& theProduct, const std::vector<CStateVector>& theVectors,
                             const std::filesystem::path& thePath);

// ---- The simulator's scenes as ASAR products -----------------------------------------------------

class CJson;
class CSimOrbit;
class CSimTimeline;
struct CSimRecord;
struct CSimScene;
struct CSimSceneTruth;

/// What an ASAR product demands of a scene: the radar values as the files state them (carrier and
/// sampling rate as floats, the pulse length and bandwidth of their codes, the PRF fs / PRI code),
/// a window length and calibration pulses that fit the packets. std::runtime_error otherwise.
void fqorvSimAsarCompleteScene(CSimScene& theScene);
/// Puts the window on the grid the packets and the instrument file state: the first sample's delay
/// is (SWST + rank x PRI code) / fs - range gate bias, the code and rank nearest to theWantedDelay
/// (or to a given tau_first, or the given SWST code).
void fqorvSimAsarSnapWindow(CSimScene& theScene, double theWantedDelay);
/// The rank of a completed scene's window (pulses in flight).
int fqorvSimAsarRank(const CSimScene& theScene);
/// The beam set (IS1 .. IS7) whose swath holds the scene's incidence.
int fqorvSimAsarBeamSet(const CSimScene& theScene);

/// The three files of a completed scene, written as the simulation runs: the instrument and orbit
/// files and the noise packets when made, one packet per record, the product renamed at finish().
class CSimAsarScene {
public:
    CSimAsarScene(const CSimScene& theScene, const CSimTimeline& theTimeline, const CSimOrbit& theOrbit,
                  const CSimSceneTruth& theTruth, const std::string& theRoot);
    /// The packet of a record: its echo, or a calibration packet at a calibration pulse.
    void writeRecord(const CSimRecord& theRecord, const uint8_t* theBlocks);
    std::filesystem::path finish();
    /// Adds to the truth what the files hold (archive{...}) and moves the pixels to the importer's
    /// grid (pixel 0 at the smallest SWST); theScale: the encoder's scale (per unit amplitude).
    void addTruth(CJson& theTruth, double theScale) const;
    const std::filesystem::path& productPath() const { return mProductPath; }

private:
    CSimAsarPacket packetOf(long thePulse, uint32_t theCounter) const;
    void writeRandomPacket(const CSimAsarPacket& thePacket, uint64_t theIndex);

    const CSimScene& mScene;
    const CSimTimeline& mTimeline;
    CSimNativeProduct mProduct;
    CSimAsarValues mValues;
    std::vector<CStateVector> mOrbitVectors;
    std::filesystem::path mProductPath, mInstrumentPath, mOrbitPath;
    std::unique_ptr<CSimAsarWriter> mWriter;
    std::vector<uint8_t> mRandomBlocks;
    int mBytes = 0;
};

/// The product's path for an output root: theRoot.N1.
std::filesystem::path fqorvSimAsarPath(const std::string& theRoot);
