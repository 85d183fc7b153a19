// The scene of the raw-data simulator: radar, raw format, orbit, timing, window, targets, noise
// and the faults to inject, with the sensor presets and the scene file that fill it.
//
// A scene is built in three layers: a sensor preset (ers2, envisat, alos, alos-fbd), then a scene
// file (JSON, with the key names of the truth file, so a truth file re-simulates its scene), then
// the command line. What none of them sets explicitly is derived by fqorvSimCompleteScene: the orbit
// that sees the scene centre at the wanted incidence, the echo window around it, the start time
// and the target grid.
#pragma once

#include <cmath>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "qorv_sim_geodesy.h"
#include "qorv_sim_native.h"
#include "qorv_sim_orbit.h"

class CJson;

/// How raw samples are stored.
enum class CSimSampleFormat {
    Ubyte5Bit,     // "UBYTE_COMPLEX": I then Q, 5-bit codes 0..31 around 15.5 (ERS, ALOS)
    FloatBaq4Bit,  // "FLOAT_COMPLEX": decoded block-adaptive 4-bit samples (ENVISAT)
};

/// Where the chain finds its fields in the line prefix; all big-endian. -1: not present.
struct CSimPrefixLayout {
    int mSize = 412;              // bytes before each line's samples
    int mCounterPos = 210;        // uint32 line counter
    int mSwstPos = 214;           // int16 sampling window start code
    int mSwstSamplesPerCode = 4;  // samples the window moves per code step
    int mPriPos = 60;             // uint16 pulse repetition interval code
    double mPriUnit = 210.94e-9;  // PRI = (code + mPriOffset) * mPriUnit, s
    int mPriOffset = 2;
    bool mPriInSamples = false;   // PRI = code / fs instead (ENVISAT)
    int mRangePos = -1;           // int32 slant range of the first sample, m (ALOS)
    double mPrfStep = 0.0;        // Hz: the PRF of a code is rounded to this step (ALOS archives state mHz); 0: exact
};

/// The radar: carrier, chirp, sampling, PRF, antenna.
struct CSimRadar {
    std::string mSensorName = "ERS-2";   // "Sensor.SensorName"
    std::string mPolarisation = "VV";
    double mCarrier = 5.3e9;             // f0, Hz
    double mBandwidth = 15.55e6;         // chirp bandwidth, Hz
    double mPulseLength = 37.12e-6;      // T, s
    double mSamplingRate = 18.96e6;      // fs, Hz
    bool mUpChirp = true;                // K > 0
    int mPriCode = 2820;                 // code of the first pulse
    double mPrf = 0.0;                   // PRF of the first pulse, Hz (from the code when 0)
    double mAntennaLength = 10.0;        // L, m
    double mPatternExtent = 2.0;         // echoes kept while |L sin(psi) / lambda| <= this

    /// Wavelength c / f0, m.
    double wavelength() const;
    /// Chirp rate K (Hz/s), negative for a down chirp.
    double chirpRate() const { return (mUpChirp ? 1.0 : -1.0) * mBandwidth / mPulseLength; }
    /// Range sample spacing c / (2 fs), m.
    double rangeSpacing() const;
};

/// One point target. Reflectivity amplitude * exp(j phase).
struct CSimTarget {
    std::string mId;
    CSimVec3 mEcef;
    double mAmplitude = 1.0;
    double mPhaseDeg = 0.0;
    bool mListed = true;  // false for random scatterers: not written to the truth's target list
    // A target given by its place in the focused image instead of mEcef: resolved by completion
    // to the ground point at height mHeight seen at zero Doppler at that line and pixel.
    bool mFromImage = false;
    double mLine = 0.0;
    double mPixel = 0.0;
    double mHeight = 0.0;
};

/// The fields of a native archive's record that a garbage fault overwrites.
enum class CSimGarbageField { Pri, Swst, Counter, Clock, Marker };

/// A garbage value in the records of one pulse (both records of a repeated pulse).
struct CSimGarbage {
    long mPulse = 0;
    CSimGarbageField mField = CSimGarbageField::Pri;
    long long mValue = -1;    // as written; -1: the field's default garbage (see docs/simulator.md)
};

/// Faults of real archives, all at pulse indices (pulses counted from 0).
struct CSimFaults {
    std::vector<long> mDroppedPulses;                 // transmitted, never recorded: the counter jumps
    std::vector<long> mRepeatedPulses;                // recorded twice with the same counter
    std::vector<std::pair<long, int>> mSwstChanges;   // from pulse p on the code moves by n codes
    std::vector<std::pair<long, int>> mPrfChanges;    // from pulse p on the PRI code is c
    std::vector<CSimGarbage> mGarbage;                // native archives only
    std::vector<long> mCalibrationPulses;             // ASAR: the echo packet is a calibration packet
    long mNoisePackets = 8;                           // ASAR: noise packets before the first echo
};

/// The form a scene is written in: the chain's raw product, a native ERS archive, an ENVISAT ASAR
/// level 0 product (Asar) or an ALOS PALSAR level 1.0 product.
enum class CSimArchive { Raw, Ceos, Envisat, Asar, Alos };

/// Target grid request: rows along azimuth, columns along range.
struct CSimGridRequest {
    int mRows = 0;
    int mCols = 0;
};

/// Everything that defines a simulated acquisition.
struct CSimScene {
    std::string mPreset = "ers2";
    CSimArchive mArchive = CSimArchive::Raw;
    CSimCeosLayout mCeosLayout = CSimCeosLayout::PgsVmp;
    CSimRadar mRadar;
    CSimSampleFormat mFormat = CSimSampleFormat::Ubyte5Bit;
    CSimPrefixLayout mPrefix;
    std::string mDataUnits = "ERS RAW";  // "RasterInfo.DataUnits", empty: not written
    std::string mOriginData;             // user key "ORIGIN DATA", empty: not written
    CSimEllipsoid mEllipsoid = CQORV_SIM_WGS84;  // for latitudes and longitudes

    // Orbit: Kepler elements (mHasKepler) or state vectors. Placed by completion when mOrbitPlaced
    // is false (node and anomaly solved from the scene centre).
    CSimUtc mEpoch;                      // t = 0 of all scene times
    bool mHasKepler = true;
    bool mOrbitPlaced = false;
    CSimKepler mKepler;
    std::vector<double> mVectorTimes;    // s from the epoch
    std::vector<CSimState> mVectors;

    // Scene centre (used to place the orbit and the window), degrees and m.
    double mCentreLat = 45.0;
    double mCentreLon = 10.0;
    double mCentreHeight = 0.0;
    double mIncidenceDeg = 23.0;
    int mLookSign = 1;                   // +1 right-looking, -1 left-looking
    bool mAscending = false;

    // Raster and timing. NaN: derived by completion.
    long mPulses = 3584;
    int mSamples = 1792;
    double mStartTime = std::nan("");    // transmit time of pulse 0, s from the epoch
    double mTauFirst = std::nan("");     // window start delay of pulse 0, s
    int mSwstCode0 = -1;                 // code of the first window (-1: derived)
    long mCounter0 = 100000;             // line counter of pulse 0
    int32_t mHeaderOffset = 0;           // bytes before record 0

    double mDopplerCentroid = 290.0;     // Hz, the Doppler at the beam centre

    // Targets and clutter.
    std::vector<CSimTarget> mTargets;
    CSimGridRequest mGrid{3, 3};         // used when no target is given
    long mScatterers = 0;
    double mScattererRms = 0.1;          // rms reflectivity amplitude of a scatterer
    long mScattererMargin = 0;           // lines of the scatterer field beyond each end of the image
    double mHeaderVelocityError = 0.0;   // relative error of the header's processing velocity

    // Noise and quantisation.
    bool mNoise = true;
    double mSnrDb = 40.0;                // image signal-to-noise ratio of a unit target
    double mRmsDn = 4.5;                 // rms of each raw component in 5-bit codes (scaled to the code width)
    int mCodeBits = 5;                   // bits of a byte sample's code (5 to 8)
    double mGain = 0.0;                  // codes per unit amplitude; 0: from mRmsDn

    uint64_t mSeed = 1;
    CSimFaults mFaults;
    bool mWriteDoppler = false;          // write a one-row "Processing.DopCenRangeCoeff"
    int mThreads = 0;                    // 0: the hardware's

    /// "RasterInfo.CellType" of the raw raster.
    std::string cellTypeName() const
    {
        return mFormat == CSimSampleFormat::Ubyte5Bit ? "UBYTE_COMPLEX" : "FLOAT_COMPLEX";
    }
};

/// Names of the sensor presets.
std::vector<std::string> fqorvSimPresetNames();
/// Fills theScene with a sensor preset ("ers2", "envisat", "alos", "alos-fbd"); false for an
/// unknown name. theFullFrame gives the preset's full frame size and a grid of a few hundred targets.
bool fqorvSimApplyPreset(CSimScene& theScene, const std::string& theName, bool theFullFrame);

/// Applies a scene file (the truth file's key names; see docs/simulator.md); throws
/// std::runtime_error with the key on a malformed value.
void fqorvSimApplySceneJson(CSimScene& theScene, const CJson& theJson);

/// The orbit of a scene (Kepler or state vectors).
std::unique_ptr<CSimOrbit> fqorvSimMakeOrbit(const CSimScene& theScene);

/// PRF (Hz) of a PRI code under a prefix layout and a sampling rate (Hz).
double fqorvSimPrfOfCode(const CSimPrefixLayout& theLayout, double theSamplingRate, int theCode);
/// The PRI code nearest to a PRF (Hz).
int fqorvSimCodeOfPrf(const CSimPrefixLayout& theLayout, double theSamplingRate, double thePrf);
/// Number of points of the chirp replica: trunc(T fs) + 1.
int fqorvSimReplicaPoints(const CSimRadar& theRadar);

/// Names of the garbage fields: "pri", "swst", "counter", "clock", "marker".
const char* fqorvSimGarbageName(CSimGarbageField theField);
bool fqorvSimParseGarbageField(const std::string& theName, CSimGarbageField& theField);

/// The archive layer of a scene, applied right after the preset: the native ERS formats hold ERS-1/2
/// scenes only, the ALOS format ALOS scenes only (std::runtime_error otherwise); an ENVISAT-format
/// line holds 5616 samples, a CEOS record at most its layout's capacity; an ALOS record states its
/// PRF in mHz, so the scene's PRFs are whole mHz.
void fqorvSimApplyArchive(CSimScene& theScene, CSimArchive theArchive, CSimCeosLayout theLayout);

/// Derives what the layers left open (orbit placement, window, start time, targets) and checks
/// the scene; throws std::runtime_error with a clear message when it is inconsistent.
void fqorvSimCompleteScene(CSimScene& theScene);
