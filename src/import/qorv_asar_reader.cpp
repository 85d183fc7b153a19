// ENVISAT ASAR image mode level 0 (ASA_IM__0P, .N1): the main and specific product headers, the
// data set of source packets walked by each packet's own length, the first echo packet's codes,
// and the two outside files a product needs: the instrument file (ASA_INS_AX: carrier, sampling
// rate, range gate bias, FBAQ tables, the rank of each beam set) and a precise orbit (DORIS,
// DOR_VOR_AX), since the product's own header holds a single state vector.
//
// A packet (all big-endian): sensing time at 0 (days since 2000-01-01 s32, s u32, us u32), ISP
// length L u16 at 24 (the packet is 39 + L bytes), mode id u16 at 40 (0x54: image mode), mode
// packet count 24 bits at 48, beam set (bits 7..2) and compression (1..0) at 51, flags at 52
// (bit 7 echo, 6 noise, 5 calibration), PRI code u16 at 54 and SWST code u16 at 56 (samples),
// pulse length code at 62 (bits 15..6, samples), chirp bandwidth code u8 at 64, FBAQ blocks from
// 68 (L + 1 - 30 bytes).
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>
#include <system_error>
#include <vector>

#include "qorv_asar_instrument.h"
#include "qorv_ceos_records.h"
#include "qorv_date.h"
#include "qorv_envisat_headers.h"
#include "qorv_fbaq.h"
#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"
#include "qorv_orbit_file.h"

namespace fs = std::filesystem;

namespace {

// The packet's fields.
constexpr int CQORV_ASAR_LENGTH = 24;
constexpr int CQORV_ASAR_LENGTH_ADD = 39;          // bytes of a packet besides its ISP length
constexpr int CQORV_ASAR_MODE = 40;
constexpr uint16_t CQORV_ASAR_IMAGE_MODE = 0x54;
constexpr int CQORV_ASAR_COUNTER = 48;
constexpr int CQORV_ASAR_BEAM = 51;
constexpr int CQORV_ASAR_FLAGS = 52;
constexpr int CQORV_ASAR_PRI = 54;
constexpr int CQORV_ASAR_SWST = 56;
constexpr int CQORV_ASAR_PULSE = 62;
constexpr int CQORV_ASAR_BANDWIDTH = 64;
constexpr int CQORV_ASAR_SAMPLES = 68;             // the first FBAQ block
constexpr uint32_t CQORV_ASAR_MIN_ISP_LENGTH = 30;  // the data field header and the first block's id
constexpr int CQORV_ASAR_FBAQ_8_4 = 1;             // the compression code of FBAQ 8:4

constexpr double CQORV_ORBIT_MARGIN = 300.0;       // s of orbit kept before and after the scene

/// Microseconds since 2000-01-01 00:00:00 UTC of a day number (days since 1970-01-01).
int64_t ticksOfDay(long theDay)
{
    return (static_cast<int64_t>(theDay) - fqorvDaysFromCivil(2000, 1, 1)) * 86400LL * 1000000LL;
}

std::string hex(unsigned theValue)
{
    char aText[16];
    std::snprintf(aText, sizeof aText, "0x%02x", theValue);
    return aText;
}

// ------------------------------------------------------------------------------------------------
// Stage 1: the headers

/// Identity, times and polarisation of the headers, and where the packets stand.
void readHeaders(const CEnvisatHeaders& h, CNativeArchive& a, double& theSensingStop)
{
    fqorvReadEnvisatIdentity(h.mMph, a);
    a.mSensor = "ENVISAT-1";
    const CQorvDate aStart = h.mMph.date("SENSING_START");
    a.mReferenceDay = aStart.dayNumber();
    a.mSensingStart = aStart.secondsOfDay();
    theSensingStop = h.mMph.time("SENSING_STOP", a.mReferenceDay);
    a.mPolarisation = fqorvEnvisatPolarisation(h.mSph, a.mPolarisation);

    // The packets' sensing times count microseconds from 2000-01-01, read every pulse.
    a.mClock.mReferenceTicks = ticksOfDay(a.mReferenceDay);
    a.mClock.mReferenceTime = 0.0;
    a.mClock.mTickSeconds = NQORV_ASAR::CLOCK_TICK;
    a.mClock.mWraps32 = false;
    a.mClock.mLatchPulses = 0;

    const CEnvisatKeyValues aDsd = h.descriptor("ASAR_SOURCE_PACKETS");
    const int64_t aOffset = aDsd.integer("DS_OFFSET");
    const int64_t aCount = aDsd.integer("NUM_DSR");
    if (aOffset < static_cast<int64_t>(CQORV_ENVISAT_MPH_BYTES))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, h.mFile + ": ASAR_SOURCE_PACKETS at byte " + std::to_string(aOffset) + ", inside the headers");
    if (aDsd.has("DSR_SIZE") && aDsd.integer("DSR_SIZE") != -1)
        a.mNotes.push_back(h.mFile + ": ASAR_SOURCE_PACKETS states records of " + aDsd.text("DSR_SIZE") +
                           " bytes; the packets are walked by their own lengths");

    CNativeRecordLayout& l = a.mLayout;
    l.mFamily = ENativeFamily::Asar;
    l.mVariable = true;
    l.mDataFile = a.mFiles.front();
    l.mFirstRecord = static_cast<uint64_t>(aOffset);
    l.mRecordLength = 0;   // every packet has its own
    l.mLengthPos = CQORV_ASAR_LENGTH;
    l.mLengthBytes = 2;
    l.mLengthAdd = CQORV_ASAR_LENGTH_ADD;
    l.mSamplesPos = CQORV_ASAR_SAMPLES;
    l.mDeclaredRecords = aCount > 0 ? static_cast<uint64_t>(aCount) : 0;
    // The codes at their places in the packet; there is no marker byte and no ERS auxiliary block.
    l.mCounterPos = CQORV_ASAR_COUNTER;
    l.mClockPos = 0;
    l.mSwstPos = CQORV_ASAR_SWST;
    l.mPriPos = CQORV_ASAR_PRI;
    l.mMarkerPos = -1;
    l.mAuxPos = -1;
    a.mLayoutName = "ENVISAT format";
}

// ------------------------------------------------------------------------------------------------
// Stage 2: the packets

/// Walks every packet: the count the file holds, the widest echo, and the first echo's codes.
/// The line plan walks them again; the walk reads only the headers (25 ms for a full frame).
CRecordCodes walkPackets(CNativeArchive& a)
{
    CNativeRecordLayout& l = a.mLayout;
    const std::string aName = l.mDataFile.filename().string();
    CNativeRecordFile aFile(l);
    const std::vector<CRecordCodes> aCodes = aFile.scan();
    l.mRecords = aCodes.size();
    const auto aFirstEcho = std::find_if(aCodes.begin(), aCodes.end(), [](const CRecordCodes& c) { return c.mEcho; });
    if (aFirstEcho == aCodes.end())
        fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES, aName + ": no echo packet among its " + std::to_string(aCodes.size()) + " packets");
    // Noise and calibration packets are no lines: the line plan leaves them out and counts them.
    for (const CRecordCodes& c : aCodes)
        if (c.mEcho) l.mSamples = std::max(l.mSamples, static_cast<int>(c.mSamples));
    if (l.mDeclaredRecords > l.mRecords) {
        a.mTruncated = true;
        a.mNotes.push_back(aName + " is truncated: " + std::to_string(l.mRecords) + " of " + std::to_string(l.mDeclaredRecords) +
                           " declared packets");
    }
    return *aFirstEcho;
}

// ------------------------------------------------------------------------------------------------
// Stage 3: the outside files

/// The validity of an ENVISAT-format product (the SENSING_START and _STOP of its main product
/// header), from the midnight of theReferenceDay; false when its headers can't be read.
bool validityOf(const fs::path& theFile, long theReferenceDay, double& theStart, double& theStop)
{
    try {
        const CEnvisatHeaders h = fqorvReadEnvisatHeaders(theFile);
        theStart = h.mMph.time("SENSING_START", theReferenceDay);
        theStop = h.mMph.time("SENSING_STOP", theReferenceDay);
        return true;
    } catch (const CImportFailure&) {
        return false;
    }
}

/// The outside files a product's data set descriptors name (their FILENAME: the products used
/// when it was made).
std::vector<std::string> namedFiles(const CEnvisatHeaders& theHeaders)
{
    std::vector<std::string> aNames;
    for (const CEnvisatKeyValues& aDsd : theHeaders.descriptors())
        if (aDsd.has("FILENAME") && !aDsd.text("FILENAME").empty()) aNames.push_back(aDsd.text("FILENAME"));
    return aNames;
}

/// Characters that the names of two files share at their start.
std::size_t commonStart(const std::string& a, const std::string& b)
{
    std::size_t n = 0;
    while (n < a.size() && n < b.size() && a[n] == b[n]) ++n;
    return n;
}

/// The product beside theProduct of the kind thePrefix ("ASA_INS_AX") that applies from theStart
/// to theStop: the only one there; else among those theNamed names (the product's descriptors),
/// or all when it names none of them, those whose validity covers that time, and of these the one
/// whose name shares the longest start with the product's (a simulated scene and its files), then
/// the last by name (the newest). An empty path when there is none; 979212 when several are there
/// and none applies.
fs::path besideOfKind(const fs::path& theProduct, const std::string& thePrefix, const std::vector<std::string>& theNamed,
                      long theReferenceDay, double theStart, double theStop)
{
    const fs::path aDirectory = theProduct.has_parent_path() ? theProduct.parent_path() : fs::path(".");
    std::vector<fs::path> aFound, aNamed;
    std::error_code aError;
    for (const fs::directory_entry& aEntry : fs::directory_iterator(aDirectory, aError)) {
        if (!aEntry.is_regular_file(aError) || fs::equivalent(aEntry.path(), theProduct, aError)) continue;
        const std::string aProduct = fqorvEnvisatProductName(aEntry.path());
        if (aProduct.rfind(thePrefix, 0) != 0) continue;
        aFound.push_back(aEntry.path());
        for (const std::string& aName : theNamed)
            if (aName == aProduct || aName == aEntry.path().filename().string()) aNamed.push_back(aEntry.path());
    }
    if (aFound.size() <= 1) return aFound.empty() ? fs::path() : aFound.front();
    std::sort(aFound.begin(), aFound.end());
    std::sort(aNamed.begin(), aNamed.end());
    const std::vector<fs::path>& aCandidates = aNamed.empty() ? aFound : aNamed;
    const std::string aOwn = theProduct.filename().string();
    fs::path aBest;
    std::string aNames;
    for (const fs::path& aFile : aCandidates) {
        aNames += (aNames.empty() ? "" : ", ") + aFile.filename().string();
        double aStart = NAN, aStop = NAN;
        if (!validityOf(aFile, theReferenceDay, aStart, aStop) || aStart > theStart || aStop < theStop) continue;
        const std::string aName = aFile.filename().string();
        if (aBest.empty()) {
            aBest = aFile;
            continue;
        }
        const std::string aBestName = aBest.filename().string();
        const std::size_t aCommon = commonStart(aName, aOwn), aBestCommon = commonStart(aBestName, aOwn);
        if (aCommon > aBestCommon || (aCommon == aBestCommon && aName > aBestName)) aBest = aFile;
    }
    if (aBest.empty())
        fqorvImportFail(CQORV_ERR_IMPORT_OUTSIDE_FILE, "none of the " + thePrefix + " products beside " + theProduct.string() + " (" +
                                                           aNames + ") applies to its sensing time: give one with " +
                                                           (thePrefix == "DOR_VOR_AX" ? "--orbit FILE" : "--aux FILE"));
    return aBest;
}

std::string timeText(long theReferenceDay, double theSeconds)
{
    CQorvDate aDate;
    aDate.set(theReferenceDay, theSeconds);
    return aDate.text();
}

/// The instrument file given, or the one beside the product.
CAsarInstrument readInstrument(const CNativeOutsideFiles& theOutside, const std::vector<std::string>& theNamed, CNativeArchive& a)
{
    fs::path aFile = theOutside.mInstrument;
    if (aFile.empty())
        aFile = besideOfKind(a.mFiles.front(), "ASA_INS_AX", theNamed, a.mReferenceDay, a.mSensingStart, a.mSensingStart);
    if (aFile.empty())
        fqorvImportFail(CQORV_ERR_IMPORT_OUTSIDE_FILE, a.mFiles.front().string() +
                                                           ": an ASAR level 0 product needs its instrument file ASA_INS_AX "
                                                           "(none lies beside it): give it with --aux FILE");
    CAsarInstrument aInstrument = fqorvReadAsarInstrument(aFile, a.mReferenceDay);
    a.mFiles.push_back(aFile);
    if (!(aInstrument.mValidityStart <= a.mSensingStart && aInstrument.mValidityStop >= a.mSensingStart))
        a.mNotes.push_back("the instrument file " + aFile.filename().string() + " applies from " +
                           timeText(a.mReferenceDay, aInstrument.mValidityStart) + " to " +
                           timeText(a.mReferenceDay, aInstrument.mValidityStop) + ", not at the sensing start " +
                           timeText(a.mReferenceDay, a.mSensingStart));
    return aInstrument;
}

/// The orbit: an orbit file's vectors around the scene. The product's own single vector is only
/// noted: a precise orbit is what the scene needs.
void readOrbit(const CNativeOutsideFiles& theOutside, const std::vector<std::string>& theNamed, const CEnvisatKeyValues& theMph,
               double theSensingStop, CNativeArchive& a)
{
    fs::path aFile = theOutside.mOrbit;
    if (aFile.empty()) aFile = besideOfKind(a.mFiles.front(), "DOR_VOR_AX", theNamed, a.mReferenceDay, a.mSensingStart, theSensingStop);
    if (aFile.empty())
        fqorvImportFail(CQORV_ERR_IMPORT_OUTSIDE_FILE, a.mFiles.front().string() +
                                                           ": an ASAR level 0 product needs a precise orbit, DOR_VOR_AX (none lies "
                                                           "beside it): give it with --orbit FILE; its header holds a single state vector");
    const std::vector<CStateVector> aAll = fqorvReadOrbitFile(aFile, a.mReferenceDay);
    a.mFiles.push_back(aFile);
    const bool aDoris = fqorvEnvisatProductName(aFile).rfind("DOR_VOR_AX", 0) == 0;
    a.mStateVectorSource = (aDoris ? "DORIS orbit file " : "orbit file ") + aFile.filename().string();

    // A precise orbit holds a day: the interpolation needs only the vectors next to the scene.
    // When the file has too few of them, all stay, and the product's description says whether they
    // reach the scene.
    std::vector<CStateVector> aNear;
    for (const CStateVector& v : aAll)
        if (v.mTime >= a.mSensingStart - CQORV_ORBIT_MARGIN && v.mTime <= theSensingStop + CQORV_ORBIT_MARGIN) aNear.push_back(v);
    a.mStateVectors = aNear.size() >= 4 ? aNear : aAll;

    if (!theMph.has("STATE_VECTOR_TIME") || !theMph.has("VECTOR_SOURCE")) return;
    const CStateVector aOwn = fqorvEnvisatStateVector(theMph, a.mReferenceDay);
    a.mNotes.push_back("the main product header's one state vector (" + theMph.text("VECTOR_SOURCE") + ", " +
                       timeText(a.mReferenceDay, aOwn.mTime) + ") is not used; the " + a.mStateVectorSource + " gives " +
                       std::to_string(a.mStateVectors.size()) + " around the scene");
}

// ------------------------------------------------------------------------------------------------
// Stage 4: the radar values of the first echo packet

/// The beam set of the first echo packet (its header theHeader) and its compression.
void readBeamSet(const uint8_t* theHeader, const CEnvisatKeyValues& theSph, CNativeArchive& a)
{
    const std::string aName = a.mFiles.front().filename().string();
    const int aBeam = theHeader[CQORV_ASAR_BEAM] >> 2;
    const int aCompression = theHeader[CQORV_ASAR_BEAM] & 3;
    if (aBeam < 1 || aBeam > 7)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aName + ": the first echo packet states the beam set " + std::to_string(aBeam) +
                                                    ", image mode has IS1 to IS7");
    if (aCompression != CQORV_ASAR_FBAQ_8_4)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aName + ": the first echo packet states the compression " + std::to_string(aCompression) +
                                                    ", only FBAQ 8:4 (1) is decoded");
    a.mBeamSet = aBeam;
    const std::string aSwath = theSph.has("SWATH") ? theSph.text("SWATH") : "";
    if (aSwath != "IS" + std::to_string(aBeam))
        a.mNotes.push_back(aName + ": the packets are of the beam set IS" + std::to_string(aBeam) + ", the header names the swath '" +
                           aSwath + "'");
}

/// The radar: carrier, sampling, delay bias, tables and rank from the instrument file; pulse,
/// bandwidth and PRF from the codes of the first echo packet (its header theHeader).
void readRadarValues(const uint8_t* theHeader, const CAsarInstrument& theInstrument, CNativeArchive& a)
{
    a.mCarrier = theInstrument.mRadarFrequency;
    a.mWavelength = CQORV_LIGHT_SPEED / theInstrument.mRadarFrequency;
    a.mSamplingRate = theInstrument.mSamplingRate;
    a.mRangeGateBias = theInstrument.mRangeGateBias;
    a.mFbaq = theInstrument.mFbaq;
    a.mRank = theInstrument.mRank[static_cast<std::size_t>(a.mBeamSet - 1)];

    const double fs = a.mSamplingRate;
    const int aPulse = fqorvBigEndianU16(theHeader + CQORV_ASAR_PULSE) >> 6;
    const int aBandwidth = theHeader[CQORV_ASAR_BANDWIDTH];
    const int aPri = fqorvBigEndianU16(theHeader + CQORV_ASAR_PRI);
    if (aPulse == 0 || aBandwidth == 0 || aPri == 0)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, a.mFiles.front().filename().string() + ": the first echo packet states a pulse code of " +
                                                    std::to_string(aPulse) + ", a bandwidth code of " + std::to_string(aBandwidth) +
                                                    " and a PRI code of " + std::to_string(aPri) + ": none may be 0");
    a.mPulseLength = aPulse / fs;
    a.mBandwidth = aBandwidth * NQORV_ASAR::BANDWIDTH_UNIT;
    a.mChirpRate = a.mBandwidth / a.mPulseLength;   // the image mode chirp rises
    a.mPrf = fs / aPri;
}

// ------------------------------------------------------------------------------------------------
// The walk

[[noreturn]] void failPacket(const CNativeRecordLayout& theLayout, uint64_t theIndex, uint64_t theOffset, const std::string& theWhy)
{
    fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH, theLayout.mDataFile.filename().string() + ": packet " + std::to_string(theIndex) +
                                                        " at byte " + std::to_string(theOffset) + " " + theWhy);
}

CRecordCodes codesOfPacket(const uint8_t* p, uint64_t theOffset)
{
    CRecordCodes c;
    const uint32_t aIspLength = fqorvBigEndianU16(p + CQORV_ASAR_LENGTH);
    const int64_t aDays = std::clamp<int64_t>(static_cast<int32_t>(fqorvBigEndianU32(p)), -CQORV_RECORD_DAYS_LIMIT, CQORV_RECORD_DAYS_LIMIT);
    c.mClock = (aDays * 86400LL + fqorvBigEndianU32(p + 4)) * 1000000LL + fqorvBigEndianU32(p + 8);
    c.mCounter = (static_cast<uint32_t>(p[CQORV_ASAR_COUNTER]) << 16) | (static_cast<uint32_t>(p[CQORV_ASAR_COUNTER + 1]) << 8) |
                 p[CQORV_ASAR_COUNTER + 2];
    c.mPri = fqorvBigEndianU16(p + CQORV_ASAR_PRI);
    c.mSwst = fqorvBigEndianU16(p + CQORV_ASAR_SWST);
    const uint8_t aFlags = p[CQORV_ASAR_FLAGS];
    c.mEcho = (aFlags & 0x80) != 0 && (aFlags & 0x60) == 0;   // noise (bit 6) and calibration (bit 5) packets are no echoes
    c.mMarker = true;
    c.mOffset = theOffset;
    c.mLength = CQORV_ASAR_LENGTH_ADD + aIspLength;
    c.mSamples = static_cast<uint32_t>(fqorvFbaqSamples(aIspLength + 1 - 30));
    return c;
}

}  // namespace

std::vector<CRecordCodes> fqorvScanAsarPackets(int theFd, const CNativeRecordLayout& theLayout, const std::function<void(int)>& theProgress)
{
    struct stat aStat {};
    if (::fstat(theFd, &aStat) != 0)
        fqorvImportFail(CQORV_ERR_RASTER_READ, theLayout.mDataFile.string() + ": " + std::strerror(errno));
    const auto aEnd = static_cast<uint64_t>(aStat.st_size);
    const uint64_t aFirst = theLayout.mFirstRecord;
    const uint64_t aLimit = theLayout.mDeclaredRecords > 0 ? theLayout.mDeclaredRecords : UINT64_MAX;
    std::vector<CRecordCodes> aCodes;
    aCodes.reserve(static_cast<std::size_t>(std::min<uint64_t>(aLimit, (aEnd - std::min(aEnd, aFirst)) / 1000 + 1)));

    // One read of the header per packet: the page cache serves it without copying the samples,
    // which make up 99 % of the packet (a walk that reads the file in big chunks and takes the
    // headers from them copies every byte and takes twice as long).
    uint8_t aHeader[CQORV_ASAR_SAMPLES];
    uint64_t aAt = aFirst;
    int aPercent = -1;
    while (aAt < aEnd && aCodes.size() < aLimit) {
        const uint64_t i = aCodes.size();
        if (aAt + CQORV_ASAR_SAMPLES > aEnd)
            failPacket(theLayout, i, aAt, "has " + std::to_string(aEnd - aAt) + " bytes left in the file, less than its header");
        if (!fqorvReadAt(theFd, aAt, aHeader, sizeof aHeader))
            fqorvImportFail(CQORV_ERR_RASTER_READ, theLayout.mDataFile.string() + ": packet " + std::to_string(i) + " at byte " +
                                                       std::to_string(aAt) + " can't be read" +
                                                       (errno != 0 ? std::string(": ") + std::strerror(errno) : std::string()));
        const uint32_t aIspLength = fqorvBigEndianU16(aHeader + CQORV_ASAR_LENGTH);
        if (aIspLength < CQORV_ASAR_MIN_ISP_LENGTH)
            failPacket(theLayout, i, aAt, "states an ISP length of " + std::to_string(aIspLength) + " bytes, less than " +
                                              std::to_string(CQORV_ASAR_MIN_ISP_LENGTH));
        const CRecordCodes c = codesOfPacket(aHeader, aAt);
        if (aAt + c.mLength > aEnd)
            failPacket(theLayout, i, aAt, "of " + std::to_string(c.mLength) + " bytes runs past the end of the file at byte " +
                                              std::to_string(aEnd));
        const uint16_t aMode = fqorvBigEndianU16(aHeader + CQORV_ASAR_MODE);
        if (c.mEcho && aMode != CQORV_ASAR_IMAGE_MODE)
            failPacket(theLayout, i, aAt, "is an echo of the mode " + hex(aMode) + ", not of image mode (" + hex(CQORV_ASAR_IMAGE_MODE) + ")");
        aCodes.push_back(c);
        aAt += c.mLength;
        const int aNow = static_cast<int>((aAt - aFirst) * 100 / (aEnd - aFirst));
        if (theProgress && aNow != aPercent) theProgress(aPercent = aNow);
    }
    // The declared packets may end before the file does.
    if (theProgress && aPercent != 100) theProgress(100);
    return aCodes;
}

CNativeArchive fqorvReadAsarEnvisat(const fs::path& theFile, const CNativeOutsideFiles& theOutside)
{
    CNativeArchive a;
    a.mFamily = ENativeFamily::Asar;
    a.mFormat = "ASAR ENVISAT format";
    a.mFiles = {theFile};
    const CEnvisatHeaders aHeaders = fqorvReadEnvisatHeaders(theFile);
    double aSensingStop = NAN;
    readHeaders(aHeaders, a, aSensingStop);
    const CRecordCodes aFirstEcho = walkPackets(a);

    std::vector<uint8_t> aEchoHeader(CQORV_ASAR_SAMPLES);
    CNativeRecordFile(a.mLayout).readBytes(aFirstEcho.mOffset, aEchoHeader.size(), aEchoHeader.data());
    readBeamSet(aEchoHeader.data(), aHeaders.mSph, a);
    const std::vector<std::string> aNamed = namedFiles(aHeaders);
    readRadarValues(aEchoHeader.data(), readInstrument(theOutside, aNamed, a), a);
    readOrbit(theOutside, aNamed, aHeaders.mMph, aSensingStop, a);
    fqorvCheckStatedValues(a);
    return a;
}
