#include "qorv_sim_asar.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <stdexcept>
#include <system_error>

#include "qorv_fbaq.h"
#include "qorv_json.h"
#include "qorv_sim_format.h"
#include "qorv_sim_geodesy.h"
#include "qorv_sim_orbit.h"
#include "qorv_sim_random.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_truth.h"

namespace fs = std::filesystem;

namespace {

// Lloyd-Max levels of a unit Gaussian quantised to 16 levels, the positive half (the same as the
// decoded block-adaptive raw format's).
constexpr double CQORV_SIM_FBAQ_LEVELS[8] = {0.1284, 0.3881, 0.6568, 0.9424, 1.2562, 1.6180, 2.0690, 2.7326};
constexpr double CQORV_SIM_FBAQ_LOG2_LOW = -10.0;    // gain of block id 0 (log2)
constexpr double CQORV_SIM_FBAQ_LOG2_SPAN = 16.0;    // ... to id 255
constexpr int CQORV_SIM_FBAQ_IDS = 256;
constexpr int CQORV_SIM_FBAQ_ROWS = 16;
constexpr uint64_t CQORV_SIM_STREAM_ASAR_PACKETS = 11;   // random blocks of noise and calibration packets
constexpr uint32_t CQORV_SIM_COUNT_MASK = (1u << NQORV_ASAR::COUNTER_BITS) - 1;
constexpr int CQORV_SIM_ASAR_BEAMS = 7;

/// The 4-bit code of level index i (0 .. 7 outwards) of a sign: codes 0 .. 7 are the positive
/// levels from the smallest out, 8 .. 15 the negative ones.
inline uint8_t codeOf(int theIndex, bool theNegative) { return static_cast<uint8_t>(theIndex + (theNegative ? 8 : 0)); }

/// The complex samples that theBytes of FBAQ blocks hold (the window length a packet states).
int samplesOf(int theBytes)
{
    const int aRest = theBytes % CQORV_FBAQ_BLOCK_BYTES;
    return theBytes / CQORV_FBAQ_BLOCK_BYTES * CQORV_FBAQ_BLOCK_SAMPLES + (aRest > 0 ? aRest - 1 : 0);
}

/// Day time (s from the midnight of the scene's epoch day) of a scene time.
double dayTime(const CSimScene& s, double t) { return s.mEpoch.mSeconds + t; }

void putFloat(std::vector<uint8_t>& theData, std::size_t theAt, float theValue)
{
    uint32_t aBits;
    std::memcpy(&aBits, &theValue, sizeof aBits);
    fqorvSimPutBE32(theData.data() + theAt, aBits);
}

/// Writes a whole file under "<path>.part" and renames it into place.
void writeWholeFile(const fs::path& thePath, const std::vector<std::string>& theParts)
{
    const fs::path aPart(thePath.string() + ".part");
    {
        CSimPartFile f(aPart);
        for (const std::string& p : theParts) f.append(p);
        f.close();
    }
    fs::rename(aPart, thePath);
}

/// The 378-byte specific product header of the instrument and orbit files: a descriptor line and
/// the one data set descriptor.
std::string smallSpecificHeader(const char* theDescriptor, const std::string& theDataSetDescriptor)
{
    const std::size_t aText = NQORV_SIM_ASAR::SMALL_SPH_SIZE - NQORV_SIM_ENVISAT::DSD_SIZE;
    return fqorvSimEnvisatPadded(fqorvSimEnvisatText("SPH_DESCRIPTOR", theDescriptor, 28), aText) + theDataSetDescriptor;
}

/// A product with the values of an outside file's main header: no state vector.
CSimNativeProduct outsideProduct(const CSimNativeProduct& p)
{
    CSimNativeProduct q = p;
    q.mStateVectors.clear();
    return q;
}

std::string instrumentName(const CSimNativeProduct& p, const CSimAsarValues& v)
{
    return fqorvSimEnvisatName("ASA_INS_AX", p, v.mValidityStart, v.mValidityStop, "");
}

/// One line of the orbit file: 128 characters and '\n'.
std::string orbitRecord(long theDay, const CStateVector& v)
{
    char aText[256];
    const int n = std::snprintf(aText, sizeof aText, "%s %.6f %.3f %.3f %.3f %.6f %.6f %.6f %s",
                                fqorvSimEnvisatDate(theDay, v.mTime).c_str(), 0.0, v.mPosition[0], v.mPosition[1],
                                v.mPosition[2], v.mVelocity[0], v.mVelocity[1], v.mVelocity[2], "0001");
    if (n < 0 || n > NQORV_SIM_ASAR::ORBIT_RECORD - 1) throw std::runtime_error("an orbit record is longer than its place");
    std::string r(aText);
    r.resize(NQORV_SIM_ASAR::ORBIT_RECORD - 1, ' ');
    return r + "\n";
}

}  // namespace

// ------------------------------------------------------------------------------------------------
// FBAQ 8:4

CSimFbaqEncoder::CSimFbaqEncoder()
{
    mTables.mI.resize(CQORV_SIM_FBAQ_ROWS * CQORV_SIM_FBAQ_IDS);
    for (int b = 0; b < CQORV_SIM_FBAQ_IDS; ++b)
        for (int i = 0; i < 8; ++i) {
            const float v = static_cast<float>(blockGain(b) * CQORV_SIM_FBAQ_LEVELS[i]);
            mTables.mI[static_cast<std::size_t>(CQORV_SIM_FBAQ_IDS * (8 + i) + b)] = v;
            mTables.mI[static_cast<std::size_t>(CQORV_SIM_FBAQ_IDS * (7 - i) + b)] = -v;
        }
    mTables.mQ = mTables.mI;
}

double CSimFbaqEncoder::blockGain(int theId)
{
    return std::exp2(CQORV_SIM_FBAQ_LOG2_LOW + CQORV_SIM_FBAQ_LOG2_SPAN * theId / (CQORV_SIM_FBAQ_IDS - 1));
}

long CSimFbaqEncoder::encode(const std::complex<double>* theIn, int n, double theScale, uint8_t* theOut,
                             float* theValues) const
{
    long aSaturated = 0;
    const float* aTable = mTables.mI.data();
    for (int aFirst = 0; aFirst < n; aFirst += CQORV_FBAQ_BLOCK_SAMPLES) {
        const int aEnd = std::min(n, aFirst + CQORV_FBAQ_BLOCK_SAMPLES);
        double aPower = 0.0;
        for (int i = aFirst; i < aEnd; ++i) aPower += std::norm(theIn[i]);
        // The component rms of the block, brought to the scene's rms of 1.
        const double aRms = theScale * std::sqrt(aPower / (2.0 * (aEnd - aFirst)));
        const double aStep = aRms > 0.0 ? (std::log2(aRms) - CQORV_SIM_FBAQ_LOG2_LOW) * (CQORV_SIM_FBAQ_IDS - 1) /
                                              CQORV_SIM_FBAQ_LOG2_SPAN
                                        : 0.0;
        const int aId = static_cast<int>(std::clamp(std::lround(aStep), 0L, static_cast<long>(CQORV_SIM_FBAQ_IDS - 1)));
        // The positive levels of this id and the decision levels halfway between them.
        float aLevel[8];
        double aDecision[7];
        for (int i = 0; i < 8; ++i) aLevel[i] = aTable[CQORV_SIM_FBAQ_IDS * (8 + i) + aId];
        for (int i = 0; i < 7; ++i) aDecision[i] = 0.5 * (static_cast<double>(aLevel[i]) + aLevel[i + 1]);
        *theOut++ = static_cast<uint8_t>(aId);
        for (int i = aFirst; i < aEnd; ++i) {
            uint8_t aCodes[2];
            const double aComponent[2] = {theScale * theIn[i].real(), theScale * theIn[i].imag()};
            for (int c = 0; c < 2; ++c) {
                const double a = std::fabs(aComponent[c]);
                int k = 0;
                for (double d : aDecision) k += a >= d;   // levels below: no branch
                aSaturated += k == 7;
                aCodes[c] = codeOf(k, aComponent[c] < 0.0);
                if (theValues) *theValues++ = aComponent[c] < 0.0 ? -aLevel[k] : aLevel[k];
            }
            *theOut++ = static_cast<uint8_t>(aCodes[0] << 4 | aCodes[1]);
        }
    }
    return aSaturated;
}

const CSimFbaqEncoder& fqorvSimFbaqEncoder()
{
    static const CSimFbaqEncoder aEncoder;
    return aEncoder;
}

int fqorvSimFbaqBytes(int theSamples)
{
    const int aRest = theSamples % CQORV_FBAQ_BLOCK_SAMPLES;
    return theSamples / CQORV_FBAQ_BLOCK_SAMPLES * CQORV_FBAQ_BLOCK_BYTES + (aRest > 0 ? aRest + 1 : 0);
}

// ------------------------------------------------------------------------------------------------
// The product

CSimAsarWriter::CSimAsarWriter(const CSimNativeProduct& theProduct, const CSimAsarValues& theValues, const fs::path& thePath)
    : mProduct(theProduct), mValues(theValues), mPath(thePath), mPart(thePath.string() + ".part")
{
    if (mProduct.mStateVectors.empty()) throw std::runtime_error("the main product header needs a state vector");
    mFile = std::make_unique<CSimPartFile>(mPart);
    mFile->append(std::string(NQORV_SIM_ENVISAT::DATA_OFFSET, ' '));   // headers: written by finish()
    mPacket.assign(NQORV_SIM_ASAR::PACKET_HEADER, 0);
    uint8_t* h = mPacket.data();
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::FIELD_HEADER_POS, NQORV_SIM_ASAR::FIELD_HEADER);
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::MODE_POS, NQORV_SIM_ASAR::MODE_IM);
    h[NQORV_SIM_ASAR::BEAM_POS] = static_cast<uint8_t>(mValues.mBeamSet << 2 | 1);
    const bool aTxV = !mProduct.mPolarisation.empty() && mProduct.mPolarisation[0] == 'V';
    const bool aRxV = mProduct.mPolarisation.size() > 1 && mProduct.mPolarisation[1] == 'V';
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::POLARISATION_POS, static_cast<uint16_t>((aTxV ? 0x40 : 0) | (aRxV ? 0x20 : 0)));
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::PULSE_POS, static_cast<uint16_t>(mValues.mPulseCode << 6));
    h[NQORV_SIM_ASAR::BANDWIDTH_POS] = static_cast<uint8_t>(mValues.mBandwidthCode);
}

CSimAsarWriter::~CSimAsarWriter()
{
    if (mFinished) return;
    mFile.reset();
    std::error_code e;
    fs::remove(mPart, e);
}

void CSimAsarWriter::writePacket(const CSimAsarPacket& p, const uint8_t* theBlocks, int theBytes)
{
    if (mFinished) throw std::logic_error("a packet written to a finished product");
    const double t = std::floor(p.mSensingTime * 1e6) * 1e-6;   // truncated to the microsecond
    if (mPackets == 0) mFirstTime = t;
    mLastTime = t;
    const auto aLength = static_cast<uint16_t>(theBytes + NQORV_SIM_ASAR::FIELD_HEADER);
    uint8_t* h = mPacket.data();
    fqorvSimPutMjd2000(h, mProduct.mReferenceDay, t);
    std::memcpy(h + 12, h, 12);
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::ISP_LENGTH_POS, aLength);
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::SEQUENCE_POS, static_cast<uint16_t>(0xC000 | (mPackets & 0x3FFF)));
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::PACKET_LENGTH_POS, aLength);
    const uint32_t aCount = p.mCount & CQORV_SIM_COUNT_MASK;
    h[NQORV_SIM_ASAR::COUNT_POS] = static_cast<uint8_t>(aCount >> 16);
    h[NQORV_SIM_ASAR::COUNT_POS + 1] = static_cast<uint8_t>(aCount >> 8);
    h[NQORV_SIM_ASAR::COUNT_POS + 2] = static_cast<uint8_t>(aCount);
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::FLAGS_POS, static_cast<uint16_t>(p.mFlags << 8));
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::PRI_POS, p.mPri);
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::SWST_POS, p.mSwst);
    fqorvSimPutBE16(h + NQORV_SIM_ASAR::WINDOW_POS, static_cast<uint16_t>(samplesOf(theBytes)));
    mFile->append(mPacket);
    mFile->append(theBlocks, static_cast<std::size_t>(theBytes));
    mDataSize += NQORV_SIM_ASAR::PACKET_HEADER + static_cast<unsigned long long>(theBytes);
    ++mPackets;
}

fs::path CSimAsarWriter::finish()
{
    CSimEnvisatMph m;
    m.mName = fqorvSimEnvisatName("ASA_IM__0P", mProduct, mFirstTime, mLastTime, ".N1");
    m.mStart = mFirstTime;
    m.mStop = mLastTime;
    m.mTotalSize = NQORV_SIM_ENVISAT::DATA_OFFSET + mDataSize;
    mFile->patch(0, fqorvSimEnvisatMainHeader(mProduct, m) + specificHeader(mDataSize));
    mFile->close();
    mFile.reset();
    fs::rename(mPart, mPath);
    mFinished = true;
    return mPath;
}

std::string CSimAsarWriter::specificHeader(unsigned long long theDataSize) const
{
    std::string h = fqorvSimEnvisatText("SPH_DESCRIPTOR", "ASA_IM__0P SPECIFIC HEADER", 28);
    h += fqorvSimEnvisatNumber("NUM_ERROR_ISPS", 0, 10);
    h += fqorvSimEnvisatNumber("NUM_DISCARDED_ISPS", 0, 10);
    h += fqorvSimEnvisatNumber("NUM_MISSING_ISPS", 0, 10);
    // The polarisation and the swath stand where readers of the format look for them by place.
    h = fqorvSimEnvisatPadded(h, NQORV_SIM_ASAR::POLAR_POS - 13);
    std::string aPolar = mProduct.mPolarisation;
    if (aPolar.size() == 2) aPolar = aPolar.substr(0, 1) + "/" + aPolar.substr(1);
    h += fqorvSimEnvisatText("TX_RX_POLAR", aPolar, 5);
    h += fqorvSimEnvisatText("SWATH", "IS" + std::to_string(mValues.mBeamSet), 3);
    h = fqorvSimEnvisatPadded(h, NQORV_SIM_ENVISAT::SPH_FIXED);
    h += fqorvSimEnvisatDescriptor("ASAR_SOURCE_PACKETS", 'M', "", NQORV_SIM_ENVISAT::DATA_OFFSET, theDataSize, mPackets, -1);
    h += fqorvSimEnvisatDescriptor("CONFIGURATION_FILE", 'R', "ASA_CON_AXVIEC20020308_112323_20020301_000000_20201231_000000", 0, 0, 0, 0);
    h += fqorvSimEnvisatDescriptor("INSTRUMENT_CHAR_FILE", 'R', mValues.mInstrumentName, 0, 0, 0, 0);
    h += fqorvSimEnvisatDescriptor("ORBIT_STATE_VECTOR_FILE", 'R', mValues.mOrbitName, 0, 0, 0, 0);
    return h;
}

// ------------------------------------------------------------------------------------------------
// The outside files

void fqorvSimWriteAsarInstrument(const CSimNativeProduct& theProduct, const CSimAsarValues& v, const CFbaqTables& theTables,
                                 const fs::path& thePath)
{
    std::vector<uint8_t> d(NQORV_ASAR::INSTRUMENT_FILE_SIZE, 0);
    putFloat(d, NQORV_SIM_ASAR::INS_FREQUENCY, static_cast<float>(v.mCarrier));
    putFloat(d, NQORV_SIM_ASAR::INS_SAMPLING_RATE, static_cast<float>(v.mSamplingRate));
    putFloat(d, NQORV_SIM_ASAR::INS_RANGE_GATE_BIAS, v.mRangeGateBias);
    for (std::size_t i = 0; i < theTables.mI.size(); ++i) {
        putFloat(d, NQORV_SIM_ASAR::INS_FBAQ_I + 4 * i, theTables.mI[i]);
        putFloat(d, NQORV_SIM_ASAR::INS_FBAQ_Q + 4 * i, theTables.mQ[i]);
    }
    // The timeline: rows swath, m, r, g of the seven beam sets.
    for (int b = 0; b < CQORV_SIM_ASAR_BEAMS; ++b) {
        fqorvSimPutBE16(d.data() + NQORV_SIM_ASAR::INS_TIMELINE + 2 * b, static_cast<uint16_t>(b + 1));
        fqorvSimPutBE16(d.data() + NQORV_SIM_ASAR::INS_TIMELINE + 2 * (2 * CQORV_SIM_ASAR_BEAMS + b),
                        static_cast<uint16_t>(v.mRanks[static_cast<std::size_t>(b)]));
    }
    const CSimNativeProduct p = outsideProduct(theProduct);
    const unsigned long long aOffset = NQORV_SIM_ENVISAT::MPH_SIZE + NQORV_SIM_ASAR::SMALL_SPH_SIZE;
    CSimEnvisatMph m;
    m.mName = instrumentName(p, v);
    m.mStart = v.mValidityStart;
    m.mStop = v.mValidityStop;
    m.mTotalSize = aOffset + d.size();
    m.mSphSize = NQORV_SIM_ASAR::SMALL_SPH_SIZE;
    m.mNumDsd = 1;
    const std::string aSph = smallSpecificHeader(
        "ASAR INSTRUMENT CHAR. DATA", fqorvSimEnvisatDescriptor("INSTRUMENT_CHAR_DATA", 'G', "", aOffset, d.size(), 1,
                                                               static_cast<long>(d.size())));
    writeWholeFile(thePath, {fqorvSimEnvisatMainHeader(p, m), aSph, std::string(d.begin(), d.end())});
}

void fqorvSimWriteDorisOrbit(const CSimNativeProduct& theProduct, const std::vector<CStateVector>& theVectors,
                             const fs::path& thePath)
{
    if (theVectors.empty()) throw std::runtime_error("an orbit file needs state vectors");
    std::string aRecords;
    for (const CStateVector& v : theVectors) aRecords += orbitRecord(theProduct.mReferenceDay, v);
    const CSimNativeProduct p = outsideProduct(theProduct);
    const unsigned long long aOffset = NQORV_SIM_ENVISAT::MPH_SIZE + NQORV_SIM_ASAR::SMALL_SPH_SIZE;
    CSimEnvisatMph m;
    m.mStart = theVectors.front().mTime;
    m.mStop = theVectors.back().mTime;
    m.mName = fqorvSimEnvisatName("DOR_VOR_AX", p, m.mStart, m.mStop, "");
    m.mTotalSize = aOffset + aRecords.size();
    m.mSphSize = NQORV_SIM_ASAR::SMALL_SPH_SIZE;
    m.mNumDsd = 1;
    const std::string aSph = smallSpecificHeader(
        "DORIS VERIFIED ORBIT", fqorvSimEnvisatDescriptor("DORIS_VERIFIED_ORBIT", 'M', "", aOffset, aRecords.size(),
                                                          static_cast<long>(theVectors.size()), NQORV_SIM_ASAR::ORBIT_RECORD));
    writeWholeFile(thePath, {fqorvSimEnvisatMainHeader(p, m), aSph, aRecords});
}

// ------------------------------------------------------------------------------------------------
// Scenes

void fqorvSimAsarCompleteScene(CSimScene& s)
{
    CSimRadar& r = s.mRadar;
    if (s.mHeaderOffset != 0) throw std::runtime_error("--header-offset has no place in an ASAR product");
    if (!s.mFaults.mGarbage.empty()) throw std::runtime_error("garbage options write into ERS archives only");
    // The files state the carrier and the sampling rate as floats, the pulse and the bandwidth as
    // codes: the scene takes the values they give.
    r.mCarrier = static_cast<float>(r.mCarrier);
    r.mSamplingRate = static_cast<float>(r.mSamplingRate);
    const long aPulse = std::lround(r.mPulseLength * r.mSamplingRate);
    if (aPulse < 1 || aPulse > 1023) throw std::runtime_error("the pulse of " + std::to_string(aPulse) + " samples has no 10-bit code");
    r.mPulseLength = static_cast<double>(aPulse) / r.mSamplingRate;
    const long aBandwidth = std::lround(r.mBandwidth / NQORV_ASAR::BANDWIDTH_UNIT);
    if (aBandwidth < 1 || aBandwidth > 255) throw std::runtime_error("the chirp bandwidth has no 8-bit code");
    r.mBandwidth = static_cast<double>(aBandwidth) * NQORV_ASAR::BANDWIDTH_UNIT;
    if (r.mPriCode <= 0 || r.mPriCode > 65535) throw std::runtime_error("a PRI code must lie in 1 .. 65535");
    r.mPrf = fqorvSimPrfOfCode(s.mPrefix, r.mSamplingRate, r.mPriCode);
    if (fqorvSimFbaqBytes(s.mSamples) + NQORV_SIM_ASAR::FIELD_HEADER > 65535)
        throw std::runtime_error("a packet holds at most 64476 samples, not " + std::to_string(s.mSamples));
    if (s.mFaults.mNoisePackets < 0) throw std::runtime_error("the noise packets cannot be fewer than 0");
    for (long p : s.mFaults.mCalibrationPulses)
        if (p < 1 || p >= s.mPulses)
            throw std::runtime_error("a calibration packet at pulse " + std::to_string(p) + " is outside 1 .. " +
                                     std::to_string(s.mPulses - 1));
}

void fqorvSimAsarSnapWindow(CSimScene& s, double theWantedDelay)
{
    const double fs = s.mRadar.mSamplingRate;
    const long aPri = s.mRadar.mPriCode;
    const double aBias = NQORV_SIM_ASAR::RANGE_GATE_BIAS;
    long aRank = 0;
    if (!std::isnan(s.mTauFirst) || s.mSwstCode0 < 0) {
        const long aTotal = std::lround(((std::isnan(s.mTauFirst) ? theWantedDelay : s.mTauFirst) + aBias) * fs);
        aRank = aTotal / aPri;
        s.mSwstCode0 = static_cast<int>(aTotal % aPri);
    } else {
        aRank = static_cast<long>(std::floor((theWantedDelay + aBias) * fs / static_cast<double>(aPri)));
    }
    s.mTauFirst = (s.mSwstCode0 + static_cast<double>(aRank) * aPri) / fs - aBias;
    long aCode = s.mSwstCode0, aLow = aCode, aHigh = aCode;
    std::vector<std::pair<long, int>> aSteps = s.mFaults.mSwstChanges;
    std::sort(aSteps.begin(), aSteps.end());
    for (const auto& [p, n] : aSteps) {
        aCode += n;
        aLow = std::min(aLow, aCode);
        aHigh = std::max(aHigh, aCode);
    }
    if (aLow < 0 || aHigh > 65535 || aRank < 1 || aRank > 15)
        throw std::runtime_error("the window's SWST codes " + std::to_string(aLow) + " .. " + std::to_string(aHigh) +
                                 " and rank " + std::to_string(aRank) + " do not fit the packets");
}

int fqorvSimAsarRank(const CSimScene& s)
{
    if (std::isnan(s.mTauFirst) || s.mRadar.mPriCode <= 0) return 0;
    const double aSamples = (s.mTauFirst + NQORV_SIM_ASAR::RANGE_GATE_BIAS) * s.mRadar.mSamplingRate - s.mSwstCode0;
    return static_cast<int>(std::lround(aSamples / s.mRadar.mPriCode));
}

int fqorvSimAsarBeamSet(const CSimScene& s)
{
    // Upper incidence (deg) of each beam set's swath, halfway into the overlap with the next.
    static const double aTop[CQORV_SIM_ASAR_BEAMS - 1] = {21.0, 29.0, 34.0, 37.5, 40.5, 43.5};
    int b = 1;
    for (double t : aTop) b += s.mIncidenceDeg >= t;
    return b;
}

fs::path fqorvSimAsarPath(const std::string& theRoot) { return theRoot + ".N1"; }

CSimAsarScene::CSimAsarScene(const CSimScene& theScene, const CSimTimeline& theTimeline, const CSimOrbit& theOrbit,
                             const CSimSceneTruth& theTruth, const std::string& theRoot)
    : mScene(theScene),
      mTimeline(theTimeline),
      mProductPath(fqorvSimAsarPath(theRoot)),
      mInstrumentPath(theRoot + "_ASA_INS_AX"),
      mOrbitPath(theRoot + "_DOR_VOR_AX"),
      mBytes(fqorvSimFbaqBytes(theScene.mSamples))
{
    const CSimScene& s = theScene;
    mProduct = fqorvSimSceneProduct(s, theTimeline, theOrbit, theTruth);
    mProduct.mFacility = "PDHS-E";
    mProduct.mProcessor = "QORVEX-SIM";
    // A plausible absolute orbit for the date (501 orbits in 35 days since the launch), not a real one.
    const double aDays = static_cast<double>(s.mEpoch.mDay - fqorvSimDaysFromCivil(2002, 3, 1)) + s.mEpoch.mSeconds / 86400.0;
    mProduct.mOrbit = 1 + static_cast<int>(std::max(0.0, aDays) * 501.0 / 35.0);
    // The main product header's one vector, at the scene centre's time to the microsecond.
    const double tc = std::round(dayTime(s, theTruth.mCentreZeroDopplerTime) * 1e6) / 1e6;
    mProduct.mStateVectors = {fqorvSimStateVector(theOrbit.state(tc - s.mEpoch.mSeconds), tc)};

    // The orbit file: a vector every minute, on whole minutes, five minutes beyond the scene.
    const double aFirst = dayTime(s, theTimeline.pulseTime(0)) - NQORV_SIM_ASAR::ORBIT_MARGIN;
    const double aLast = dayTime(s, theTimeline.pulseTime(s.mPulses - 1)) + NQORV_SIM_ASAR::ORBIT_MARGIN;
    for (double t = std::floor(aFirst / NQORV_SIM_ASAR::ORBIT_STEP) * NQORV_SIM_ASAR::ORBIT_STEP;
         t < aLast + NQORV_SIM_ASAR::ORBIT_STEP; t += NQORV_SIM_ASAR::ORBIT_STEP)
        mOrbitVectors.push_back(fqorvSimStateVector(theOrbit.state(t - s.mEpoch.mSeconds), t));

    CSimAsarValues& v = mValues;
    v.mBeamSet = fqorvSimAsarBeamSet(s);
    const int aRank = fqorvSimAsarRank(s);
    for (int b = 0; b < CQORV_SIM_ASAR_BEAMS; ++b) v.mRanks[static_cast<std::size_t>(b)] = std::clamp(aRank + b + 1 - v.mBeamSet, 1, 15);
    v.mCarrier = s.mRadar.mCarrier;
    v.mSamplingRate = s.mRadar.mSamplingRate;
    v.mPulseCode = static_cast<int>(std::lround(s.mRadar.mPulseLength * s.mRadar.mSamplingRate));
    v.mBandwidthCode = static_cast<int>(std::lround(s.mRadar.mBandwidth / NQORV_ASAR::BANDWIDTH_UNIT));
    // The instrument file holds from the midnight before the scene's day to the one after it.
    v.mValidityStart = std::floor(aFirst / 86400.0) * 86400.0 - 86400.0;
    v.mValidityStop = std::ceil(aLast / 86400.0) * 86400.0 + 86400.0;
    v.mInstrumentName = instrumentName(outsideProduct(mProduct), v);
    v.mOrbitName = fqorvSimEnvisatName("DOR_VOR_AX", mProduct, mOrbitVectors.front().mTime, mOrbitVectors.back().mTime, "");

    fqorvSimWriteAsarInstrument(mProduct, v, fqorvSimFbaqEncoder().tables(), mInstrumentPath);
    fqorvSimWriteDorisOrbit(mProduct, mOrbitVectors, mOrbitPath);
    mWriter = std::make_unique<CSimAsarWriter>(mProduct, v, mProductPath);
    mRandomBlocks.resize(static_cast<std::size_t>(mBytes));
    // The noise packets: the receiver listens without a pulse, at the PRI before the first echo.
    const long n = s.mFaults.mNoisePackets;
    for (long i = 0; i < n; ++i) {
        CSimAsarPacket p = packetOf(0, static_cast<uint32_t>(s.mCounter0 - n + i));
        p.mFlags = NQORV_SIM_ASAR::NOISE;
        p.mSensingTime = dayTime(s, theTimeline.pulseTime(0) - static_cast<double>(n - i) / theTimeline.prf(0));
        writeRandomPacket(p, static_cast<uint64_t>(i));
    }
}

CSimAsarPacket CSimAsarScene::packetOf(long thePulse, uint32_t theCounter) const
{
    CSimAsarPacket p;
    p.mCount = theCounter;
    p.mSensingTime = dayTime(mScene, mTimeline.pulseTime(thePulse));
    p.mPri = static_cast<uint16_t>(mTimeline.priCode(thePulse));
    p.mSwst = static_cast<uint16_t>(mTimeline.swstCode(thePulse));
    return p;
}

void CSimAsarScene::writeRandomPacket(const CSimAsarPacket& thePacket, uint64_t theIndex)
{
    // Blocks of random codes under a mid-range block id: receiver noise as the packets carry it.
    CSimRandom aRandom(mScene.mSeed, CQORV_SIM_STREAM_ASAR_PACKETS, theIndex);
    for (std::size_t i = 0; i < mRandomBlocks.size(); ++i)
        mRandomBlocks[i] = i % CQORV_FBAQ_BLOCK_BYTES == 0 ? uint8_t{128} : static_cast<uint8_t>(aRandom.next());
    mWriter->writePacket(thePacket, mRandomBlocks.data(), mBytes);
}

void CSimAsarScene::writeRecord(const CSimRecord& theRecord, const uint8_t* theBlocks)
{
    CSimAsarPacket p = packetOf(theRecord.mPulse, theRecord.mCounter);
    const std::vector<long>& c = mScene.mFaults.mCalibrationPulses;
    if (std::find(c.begin(), c.end(), theRecord.mPulse) == c.end()) {
        mWriter->writePacket(p, theBlocks, mBytes);
        return;
    }
    p.mFlags = NQORV_SIM_ASAR::CALIBRATION;
    writeRandomPacket(p, (uint64_t{1} << 32) + static_cast<uint64_t>(theRecord.mPulse));
}

fs::path CSimAsarScene::finish() { return mWriter->finish(); }

void CSimAsarScene::addTruth(CJson& theTruth, double theScale) const
{
    const CSimScene& s = mScene;
    const CSimTimeline& tl = mTimeline;
    // The importer's pixel 0 is the first sample at the smallest SWST code.
    int aLowest = s.mSwstCode0;
    for (long k = 0; k < s.mPulses; ++k) aLowest = std::min(aLowest, tl.swstCode(k));
    const int aShift = s.mSwstCode0 - aLowest;
    if (aShift != 0) {
        CJson aTargets = CJson::array();
        for (const CJson& t : theTruth["targets"].elements()) {
            CJson u = t;
            u["expected_pixel"] = t["expected_pixel"].number() + aShift;
            aTargets.push(u);
        }
        theTruth["targets"] = aTargets;
        theTruth["scene_centre"]["expected_pixel"] = theTruth["scene_centre"]["expected_pixel"].number() + aShift;
    }

    CJson a = CJson::object();
    a["format"] = "ASAR ENVISAT format";
    a["layout"] = "ENVISAT format";
    a["path"] = mProductPath.filename().string();
    a["data_file"] = mProductPath.filename().string();
    a["instrument_file"] = mInstrumentPath.filename().string();
    a["orbit_file"] = mOrbitPath.filename().string();
    a["first_record"] = NQORV_SIM_ENVISAT::DATA_OFFSET;
    a["packet_header"] = NQORV_SIM_ASAR::PACKET_HEADER;
    a["packet_bytes"] = NQORV_SIM_ASAR::PACKET_HEADER + mBytes;
    a["counter_pos"] = NQORV_SIM_ASAR::COUNT_POS;
    a["counter_bits"] = NQORV_ASAR::COUNTER_BITS;
    a["orbit"] = mProduct.mOrbit;
    a["beam_set"] = mValues.mBeamSet;
    a["noise_packets"] = s.mFaults.mNoisePackets;
    CJson aCalibration = CJson::array();
    std::vector<long> c = s.mFaults.mCalibrationPulses;
    std::sort(c.begin(), c.end());
    for (long p : c) {
        CJson e = CJson::object();
        e["pulse"] = p;
        e["record"] = tl.recordOfPulse(p);
        aCalibration.push(e);
    }
    a["calibration_pulses"] = aCalibration;

    CJson& w = a["window"] = CJson::object();
    w["rank"] = fqorvSimAsarRank(s);
    w["range_gate_bias"] = static_cast<double>(mValues.mRangeGateBias);
    w["swst_unit"] = 1.0 / s.mRadar.mSamplingRate;
    w["lowest_swst_code"] = aLowest;
    w["pixel_shift"] = aShift;
    w["definition"] = "tau = (swst_code + rank * pri_code) / fs - range_gate_bias; pixel 0 of the import at the "
                      "lowest SWST code: expected_pixel counts from there";

    CJson& f = a["fbaq"] = CJson::object();
    f["block_bytes"] = CQORV_FBAQ_BLOCK_BYTES;
    f["gain_definition"] = "value(id, m) = 2^(-10 + 16 id / 255) * L(m), L the 16 Lloyd-Max levels of a unit Gaussian; "
                           "the scene's component rms is 1";
    f["scale"] = theScale;

    CJson aTimes = CJson::array();
    for (const CStateVector& v : mProduct.mStateVectors) aTimes.push(CJson(v.mTime - s.mEpoch.mSeconds));
    CJson& sv = a["state_vectors"] = CJson::object();
    sv["source"] = "main product header (FP)";
    sv["times"] = aTimes;
    CJson& ov = a["orbit_file_vectors"] = CJson::object();
    ov["count"] = static_cast<long>(mOrbitVectors.size());
    ov["first_time"] = mOrbitVectors.front().mTime - s.mEpoch.mSeconds;
    ov["step"] = NQORV_SIM_ASAR::ORBIT_STEP;
    theTruth["archive"] = a;
    theTruth["raster"]["file"] = mProductPath.filename().string();
    theTruth["raster"]["header"] = CJson();
    theTruth["events"]["calibration_pulses"] = aCalibration;
}
