// Writer of ALOS PALSAR level 1.0 products (CEOS) from plain values: a directory holding the
// leader LED-<scene id> and one image file IMG-<pol>-<scene id> per polarisation. The simulator
// writes its ALOS scenes through it, and the importer's tests build their fixtures with it.
//
// The writer streams: the headers first, then one line at a time (the same samples into every image
// file), then finish() completes the image descriptors with the records written and renames the
// directory into place. All is written under "<directory>.part"; a writer destroyed before
// finish() removes what it wrote. I/O failures throw std::runtime_error.
//
// Times are seconds from the midnight (UTC) of CSimAlosProduct::mReferenceDay. Binary fields are
// big-endian; An/In/Fn are CEOS text fields.
//
// LED-<id>:
//   @0      file descriptor, 720 bytes, types 11,192,18,18.
//   @720    data set summary, 4096 bytes, types 10,10,18,20: 68 A32 scene centre time
//           "YYYYMMDDhhmmssttt" · 116/132 F16 centre latitude, longitude (deg) · 396 A16 "ALOS" ·
//           412 A32 "ALOS-PALSAR-FBS" (or FBD) · 444 I8 orbit · 484 F8 incidence (deg) · 500 F16
//           wavelength (m) · 518 A16 "LINEAR FM CHIRP" · 710 F16 sampling rate (MHz) · 742 F16
//           pulse length (us) · 818/834 F16 I/Q bias · 934 F16 PRF (mHz) · 1046 A16 facility ·
//           1062 A8 processor · 1802 I4 PRF switch flag (1: the PRF changes) · 1806 I8 the line
//           number at which the new PRF begins (0 without a switch).
//   @4816   platform position, 386 + 132 n bytes, types 10,30,18,20, n vectors 60 s apart (the
//           layout of the ERS leaders, velocities in m/s).
//   then    calibration, 4096 bytes, types 10,130,18,20: 60 I4 pulse length (us), 64 I4 chirp
//           bandwidth (MHz), 68 I4 sampling rate (MHz); a value that is not a whole number is blank.
// IMG-<pol>-<id>:
//   @0      file descriptor, 720 bytes, types 63,192,18,18: 180 I6 records · 186 I6 record length ·
//           236 I8 lines · 248 I8 data pixels per line · 276 I4 prefix 400 (without the record
//           header) · 280 I8 sample bytes · 288 I4 suffix bytes.
//   @720    one signal record per line, types 50,10,50,18, 412 + 2 (pixels + right fill) bytes:
//           0 u32 sequence · 8 u32 length · 12 u32 line number · 24 u32 data pixels · 28 u32
//           right-fill pixels · 36/40/44 u32 year, day of the year, millisecond of the day
//           (truncated) · 52/54 u16 transmit/receive polarisation (0 H, 1 V) · 56 u32 PRF (mHz) ·
//           68 u32 pulse length (ns) · 116 s32 slant range of the first sample (m) · 412 I,Q bytes ·
//           right-fill pixels 0.
#pragma once

#include <cmath>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "qorv_state_vectors.h"

/// What an ALOS product states, as plain values.
struct CSimAlosProduct {
    std::string mSceneId = "ALPSRP000000000-H1.0__A";
    std::vector<std::string> mPolarisations{"HH"};   // one image file each
    long mReferenceDay = 0;                   // days since 1970-01-01 that every time here counts from
    int mSamples = 0;                         // data pixels per line
    int mRightFill = 40;                      // right-fill pixels per line
    long mDeclaredLines = -1;                 // lines the descriptors state; -1: the records written
    int mOrbit = 0;
    std::string mSensorText;                  // DSS 412; empty: "ALOS-PALSAR-" and FBS or FBD from the sampling rate
    std::string mFacility = "EORC";
    std::string mProcessor = "SIM";

    double mWavelength = NAN;                 // m
    double mSamplingRate = NAN;               // Hz
    double mPulseLength = NAN;                // s
    double mBandwidth = NAN;                  // Hz (calibration record)
    double mPrf = NAN;                        // Hz, of the first line (the summary holds mHz)
    double mIBias = 15.5, mQBias = 15.5;
    long long mPrfSwitchLine = -1;            // line number where a new PRF begins; -1: none

    double mCentreTime = NAN;                 // s, written to the ms
    double mCentreLatitude = NAN, mCentreLongitude = NAN, mIncidenceDeg = NAN;
    std::vector<CStateVector> mStateVectors;  // Earth-fixed, equally spaced, at least 2
};

/// What one signal record states.
struct CSimAlosLine {
    uint32_t mLineNumber = 0;
    double mTime = 0.0;             // s from the reference day's midnight; written as whole ms, truncated
    uint32_t mPrfMilliHz = 0;
    int32_t mRange = 0;             // slant range of the first sample, m
};

/// An ALOS product being written.
class CSimAlosWriter {
public:
    /// Opens the product directory theDirectory (written as "<theDirectory>.part"; an earlier
    /// product of that name is replaced). std::runtime_error for a value the format can't hold.
    CSimAlosWriter(const CSimAlosProduct& theProduct, const std::filesystem::path& theDirectory);
    ~CSimAlosWriter();
    CSimAlosWriter(const CSimAlosWriter&) = delete;
    CSimAlosWriter& operator=(const CSimAlosWriter&) = delete;

    /// Appends one line to every image file; theSamples holds mSamples I,Q byte pairs.
    void writeLine(const CSimAlosLine& theLine, const uint8_t* theSamples);
    /// Completes the descriptors and renames the directory into place; returns its path.
    std::filesystem::path finish();
    long records() const { return mRecords; }

    /// File names of a product: "LED-<id>", "IMG-<pol>-<id>".
    static std::string leaderName(const CSimAlosProduct& theProduct);
    static std::string imageName(const CSimAlosProduct& theProduct, const std::string& thePolarisation);

private:
    struct CFiles;
    CSimAlosProduct mProduct;
    std::filesystem::path mPath, mPart;
    std::unique_ptr<CFiles> mFiles;
    long mRecords = 0;
    bool mFinished = false;
};

// ---- The simulator's scenes as ALOS products ---------------------------------------------------

class CJson;
class CSimOrbit;
class CSimTimeline;
struct CSimRecord;
struct CSimScene;
struct CSimSceneTruth;

/// What the ALOS product of a completed scene states: the radar, the truth's scene centre, the PRF
/// of the first pulse, the switch line of the first PRF change, vectors every 60 s on whole minutes
/// from at least 2 minutes before the first pulse to 2 minutes after the last. The reference day is
/// the day of the first pulse. FBD products have the polarisations HH and HV.
CSimAlosProduct fqorvSimAlosSceneProduct(const CSimScene& theScene, const CSimTimeline& theTimeline,
                                         const CSimOrbit& theOrbit, const CSimSceneTruth& theTruth);

/// The record of theRecord: its line number, the pulse's time, PRF and window.
CSimAlosLine fqorvSimAlosSceneLine(const CSimScene& theScene, const CSimTimeline& theTimeline,
                                   const CSimAlosProduct& theProduct, const CSimRecord& theRecord);

/// Adds to a scene's truth file what the product holds: its files and layout, the time and
/// window definitions, the state vectors and the PRF switch.
void fqorvSimAddAlosTruth(CJson& theTruth, const CSimScene& theScene, const CSimAlosProduct& theProduct,
                          const std::filesystem::path& theDirectory);
