// ALOS PALSAR level 1.0 (CEOS): the leader's data set summary, platform position and calibration
// records, and one image file (one polarisation) whose records each hold one echo line.
//
// Leader records are found by their kind (the first two type bytes), wherever the processor put
// them: data set summary 10,10; platform position 10,30; calibration 10,130. The image file is a
// 720-byte descriptor followed by signal data records of one length: a 412-byte prefix, the
// data pixels (I, Q bytes) and right-fill pixels, whose count each record states.
//
// Times: each record states the year, the day of the year and the millisecond of the day of its
// line, truncated to the millisecond. The day of the first record is the reference day; the clock
// counts milliseconds from its midnight, so a scene across midnight keeps increasing times.
#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "qorv_ceos_records.h"
#include "qorv_date.h"
#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"
#include "qorv_native_reader.h"

namespace {

constexpr uint32_t CQORV_ALOS_PREFIX = 412;                 // bytes before the samples of a signal record
constexpr double CQORV_ALOS_FBS_RATE = 32.0e6;              // Hz, single polarisation
constexpr double CQORV_ALOS_FBD_RATE = 16.0e6;              // Hz, dual polarisation
constexpr double CQORV_ALOS_FBS_BANDWIDTH = 28.0e6;         // Hz, nominal chirps where no calibration record states one
constexpr double CQORV_ALOS_FBD_BANDWIDTH = 14.0e6;
constexpr double CQORV_ALOS_MAX_SPEED = 20000.0;            // m/s: a velocity above it is in mm/s
constexpr int64_t CQORV_ALOS_MS_PER_DAY = 86400000;

// Fields of a signal data record (big-endian binary).
namespace NPos {
constexpr int LENGTH = 8, LINE = 12, PIXELS = 24, RIGHT_FILL = 28, YEAR = 36, DAY_OF_YEAR = 40, MS_OF_DAY = 44;
constexpr int TX_POL = 52, RX_POL = 54, PRF = 56, RANGE = 116;
}  // namespace NPos

int32_t bigEndianS32(const uint8_t* theBytes) { return static_cast<int32_t>(fqorvBigEndianU32(theBytes)); }

/// Days since 1970 of a year and a day of that year (1 = 1 January).
long dayOf(uint32_t theYear, uint32_t theDayOfYear)
{
    return fqorvDaysFromCivil(static_cast<int>(theYear), 1, 1) + static_cast<long>(theDayOfYear) - 1;
}

/// The polarisation of a file name "IMG-HV-...", "" when the name does not say.
std::string polarisationOfName(const std::string& theName)
{
    if (theName.size() < 7 || theName.compare(0, 4, "IMG-") != 0 || theName[6] != '-') return "";
    const std::string aPol = theName.substr(4, 2);
    const auto isHv = [](char c) { return c == 'H' || c == 'V'; };
    return isHv(aPol[0]) && isHv(aPol[1]) ? aPol : "";
}

/// The polarisation codes of a record: 0 horizontal, 1 vertical; "" for others.
std::string polarisationOfCodes(uint16_t theTx, uint16_t theRx)
{
    if (theTx > 1 || theRx > 1) return "";
    return std::string(1, theTx == 0 ? 'H' : 'V') + (theRx == 0 ? 'H' : 'V');
}

// ---------------------------------------------------------------------------------------------
// The image file

/// The descriptor and the first signal record: the layout, the reference day, the polarisation.
void readImageFile(const std::filesystem::path& theImage, CNativeArchive& theArchive)
{
    const std::string aName = theImage.filename().string();
    const std::vector<CCeosRecord> aFirst = fqorvWalkCeosFile(theImage, 2);
    if (aFirst.size() < 2) fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES, aName + " holds no signal record after its descriptor");
    const CCeosFields aFdr = fqorvReadCeosRecord(theImage, aFirst[0], aName + " file descriptor");
    const std::vector<uint8_t> aHead = fqorvReadFileBytes(theImage, aFirst[1].mOffset, CQORV_ALOS_CODE_SPAN);
    if (aHead.size() < static_cast<std::size_t>(CQORV_ALOS_CODE_SPAN) || aFirst[1].mLength < CQORV_ALOS_PREFIX)
        fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH, aName + ": the first signal record of " +
                                                            std::to_string(aFirst[1].mLength) + " bytes holds no 412-byte prefix");

    // The record's own statements against the descriptor's.
    const uint32_t aLength = aFirst[1].mLength;
    const uint32_t aPixels = fqorvBigEndianU32(aHead.data() + NPos::PIXELS);
    const uint32_t aFill = fqorvBigEndianU32(aHead.data() + NPos::RIGHT_FILL);
    const auto mismatch = [&](const std::string& theWhat) {
        fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH, aName + ": " + theWhat);
    };
    const int64_t aStatedLength = aFdr.integer(186, 6).value_or(aLength);
    if (aStatedLength != aLength)
        mismatch("the descriptor states records of " + std::to_string(aStatedLength) + " bytes, the first record " +
                 std::to_string(aLength));
    const int64_t aStatedPixels = aFdr.integer(248, 8).value_or(aPixels);
    if (aStatedPixels != aPixels)
        mismatch("the descriptor states " + std::to_string(aStatedPixels) + " pixels per line, the first record " +
                 std::to_string(aPixels));
    if (aPixels == 0 || static_cast<uint64_t>(CQORV_ALOS_PREFIX) + 2ull * aPixels + 2ull * aFill != aLength)
        mismatch("a prefix of 412 bytes, " + std::to_string(aPixels) + " data and " + std::to_string(aFill) +
                 " right-fill pixels of 2 bytes do not make the record's " + std::to_string(aLength) + " bytes");

    CNativeRecordLayout& aLayout = theArchive.mLayout;
    aLayout.mFamily = ENativeFamily::Alos;
    aLayout.mVariable = false;
    aLayout.mDataFile = theImage;
    aLayout.mFirstRecord = aFirst[0].mLength;
    aLayout.mRecordLength = aLength;
    aLayout.mLengthPos = NPos::LENGTH;
    aLayout.mLengthBytes = 4;
    aLayout.mLengthAdd = 0;
    aLayout.mSamplesPos = CQORV_ALOS_PREFIX;
    aLayout.mSamples = static_cast<int>(aPixels);
    aLayout.mSuffix = aLength - CQORV_ALOS_PREFIX - 2 * aPixels;
    aLayout.mDeclaredRecords = static_cast<uint64_t>(std::max<int64_t>(0, aFdr.integer(236, 8).value_or(0)));
    // The line number is the counter; the clock is the millisecond of the day. No SWST, PRI code
    // or marker: the PRF and the window (the slant range) are stated in every record.
    aLayout.mCounterPos = NPos::LINE;
    aLayout.mClockPos = NPos::MS_OF_DAY;
    aLayout.mSwstPos = -1;
    aLayout.mPriPos = -1;
    aLayout.mMarkerPos = -1;
    aLayout.mAuxPos = -1;
    theArchive.mLayoutName = "ALOS level 1.0";
    fqorvCountRecords(theArchive);

    const uint32_t aYear = fqorvBigEndianU32(aHead.data() + NPos::YEAR);
    const uint32_t aDayOfYear = fqorvBigEndianU32(aHead.data() + NPos::DAY_OF_YEAR);
    if (aYear < 1990 || aYear > 2100 || aDayOfYear < 1 || aDayOfYear > 366)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aName + ": the first record's date (year " + std::to_string(aYear) + ", day " +
                                                    std::to_string(aDayOfYear) + ") is not one");
    theArchive.mReferenceDay = dayOf(aYear, aDayOfYear);
    theArchive.mClock.mReferenceTime = 0.0;
    theArchive.mClock.mReferenceTicks = 0;
    theArchive.mClock.mTickSeconds = NQORV_ALOS::CLOCK_TICK;
    theArchive.mClock.mWraps32 = false;
    theArchive.mClock.mLatchPulses = 0;

    // The polarisation: the records' codes, checked against the file's name.
    const std::string aByCodes =
        polarisationOfCodes(fqorvBigEndianU16(aHead.data() + NPos::TX_POL), fqorvBigEndianU16(aHead.data() + NPos::RX_POL));
    const std::string aByName = polarisationOfName(aName);
    if (!aByName.empty() && aByName != aByCodes) {
        theArchive.mPolarisation = aByName;
        if (!aByCodes.empty())
            theArchive.mNotes.push_back("the records' polarisation codes say " + aByCodes + ", the file name " + aByName +
                                        ": the name's is taken");
    } else if (!aByCodes.empty()) {
        theArchive.mPolarisation = aByCodes;
    } else {
        theArchive.mPolarisation = "HH";
        theArchive.mNotes.push_back("neither the records nor the name of " + aName + " state the polarisation: HH taken");
    }
    // The scene's identity: the name behind "IMG-XX-".
    theArchive.mProductName = aByName.empty() ? aName : aName.substr(7);
}

// ---------------------------------------------------------------------------------------------
// The leader

/// Mission, product kind, scene and radar values of the data set summary.
void readDataSetSummary(const CCeosFields& theDss, CNativeArchive& theArchive)
{
    const std::string aMission = theDss.text(396, 16);
    if (aMission.rfind("ALOS", 0) != 0)
        fqorvImportFail(CQORV_ERR_IMPORT_LEADER, theDss.name() + " is of the mission '" + aMission + "', not ALOS");
    theArchive.mSensor = "ALOS_PALSAR";

    long aDay = 0;
    double aSeconds = 0.0;
    if (fqorvParseCeosTime(theDss.text(68, 32), aDay, aSeconds))
        theArchive.mCentreTime = static_cast<double>(aDay - theArchive.mReferenceDay) * 86400.0 + aSeconds;
    theArchive.mCentreLatitude = theDss.real(116, 16);
    theArchive.mCentreLongitude = theDss.real(132, 16);
    if (theArchive.mCentreLongitude > 180.0) theArchive.mCentreLongitude -= 360.0;
    theArchive.mIncidenceDeg = theDss.real(484, 8);
    theArchive.mOrbit = static_cast<int>(theDss.integer(444, 8).value_or(-1));

    theArchive.mWavelength = fqorvCeosRequiredReal(theDss, 500, 16, "wavelength");
    theArchive.mCarrier = CQORV_LIGHT_SPEED / theArchive.mWavelength;
    theArchive.mSamplingRate = theDss.real(710, 16) * 1.0e6;   // MHz
    theArchive.mPulseLength = theDss.real(742, 16) * 1.0e-6;   // us
    theArchive.mIBias = theDss.real(818, 16);
    theArchive.mQBias = theDss.real(834, 16);
    theArchive.mPrf = theDss.real(934, 16) * 1.0e-3;           // mHz
    theArchive.mFacility = theDss.text(1046, 16);
    theArchive.mProcessor = theDss.text(1062, 8);

    // Polarimetric products alternate H and V pulses: the stated PRF is twice the PRF of a channel.
    const std::string aSensorText = theDss.text(412, 32);
    if (theArchive.mPrf > NQORV_ALOS::PRF_MAX || aSensorText.find("PLR") != std::string::npos)
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theDss.name() + " describes a polarimetric product (PRF " +
                                                            theDss.text(934, 16) + " mHz, sensor '" + aSensorText +
                                                            "'): polarimetric ALOS products are not imported");

    const int64_t aSwitch = theDss.integer(1802, 4).value_or(0);
    theArchive.mPrfSwitchLine = aSwitch != 0 ? fqorvCeosRequiredInteger(theDss, 1806, 8, "line of the PRF switch") : -1;
    if (aSwitch != 0)
        theArchive.mNotes.push_back("the leader states a PRF switch at line " + std::to_string(theArchive.mPrfSwitchLine));
}

/// The calibration record's pulse length (us), bandwidth (MHz) and sampling rate (MHz), whole
/// numbers, take the place of the summary's where they are stated.
void readCalibration(const CCeosFields* theCalibration, CNativeArchive& theArchive)
{
    const auto stated = [&](int thePos) {
        const std::optional<int64_t> aValue = theCalibration ? theCalibration->integer(thePos, 4) : std::nullopt;
        return aValue && *aValue > 0 ? static_cast<double>(*aValue) : NAN;
    };
    const double aPulse = stated(60), aBandwidth = stated(64), aRate = stated(68);
    if (!std::isnan(aPulse)) theArchive.mPulseLength = aPulse * 1.0e-6;
    if (!std::isnan(aRate)) theArchive.mSamplingRate = aRate * 1.0e6;
    theArchive.mBandwidth = aBandwidth * 1.0e6;
}

/// FBS or FBD from the sampling rate; the nominal bandwidth where none is stated; the down chirp.
void settleProductKind(const std::string& theLeader, CNativeArchive& theArchive)
{
    const double fs = theArchive.mSamplingRate;
    const bool aFbs = std::fabs(fs - CQORV_ALOS_FBS_RATE) < 0.5e6;
    const bool aFbd = std::fabs(fs - CQORV_ALOS_FBD_RATE) < 0.5e6;
    if (!aFbs && !aFbd) {
        char aText[96];
        std::snprintf(aText, sizeof aText, "%.9g Hz: neither FBS (32 MHz) nor FBD (16 MHz)", fs);
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theLeader + " states a sampling rate of " + aText);
    }
    theArchive.mOriginData = aFbs ? "ALOS_PALSAR_FBS10" : "ALOS_PALSAR_FBD10";
    if (std::isnan(theArchive.mBandwidth)) {
        theArchive.mBandwidth = aFbs ? CQORV_ALOS_FBS_BANDWIDTH : CQORV_ALOS_FBD_BANDWIDTH;
        theArchive.mNotes.push_back(std::string("the leader states no chirp bandwidth: the nominal ") +
                                    (aFbs ? "28" : "14") + " MHz taken");
    }
    if (std::isnan(theArchive.mPulseLength))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theLeader + " states no pulse length");
    theArchive.mChirpRate = -theArchive.mBandwidth / theArchive.mPulseLength;
}

/// The leader's records of interest, found by their kind.
void readLeader(const std::filesystem::path& theLeader, CNativeArchive& theArchive)
{
    const std::vector<CCeosRecord> aRecords = fqorvWalkCeosFile(theLeader);
    const std::string aName = theLeader.filename().string();
    const CCeosRecord* aSummary = fqorvFindCeosRecord(aRecords, 10, 10);
    if (aSummary == nullptr)
        fqorvImportFail(CQORV_ERR_IMPORT_LEADER, aName + " holds no data set summary record (types 10,10)");
    readDataSetSummary(fqorvReadCeosRecord(theLeader, *aSummary, aName + " data set summary"), theArchive);

    const CCeosRecord* aCalibration = fqorvFindCeosRecord(aRecords, 10, 130);
    if (aCalibration != nullptr) {
        const CCeosFields aFields = fqorvReadCeosRecord(theLeader, *aCalibration, aName + " calibration record");
        readCalibration(&aFields, theArchive);
    } else {
        theArchive.mNotes.push_back(aName + " holds no calibration record (types 10,130)");
        readCalibration(nullptr, theArchive);
    }
    settleProductKind(aName, theArchive);

    const CCeosRecord* aPosition = fqorvFindCeosRecord(aRecords, 10, 30);
    if (aPosition == nullptr) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aName + " holds no platform position record (types 10,30)");
    const CCeosFields aPpr = fqorvReadCeosRecord(theLeader, *aPosition, aName + " platform position record");
    theArchive.mStateVectors = fqorvReadCeosPlatformPosition(aPpr, theArchive.mReferenceDay, theArchive.mNotes);
    theArchive.mStateVectorSource = "leader";
    // Some processors state the velocities in mm/s: a layout of its own, not read here.
    for (const CStateVector& v : theArchive.mStateVectors)
        if (std::hypot(v.mVelocity[0], v.mVelocity[1], v.mVelocity[2]) > CQORV_ALOS_MAX_SPEED)
            fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aPpr.name() + " states velocities of " +
                                                        std::to_string(std::lround(std::hypot(v.mVelocity[0], v.mVelocity[1], v.mVelocity[2]))) +
                                                        " per second: not m/s (a leader in mm/s is not imported)");
}

}  // namespace

CNativeArchive fqorvReadAlosCeos(const std::filesystem::path& theLeader, const std::filesystem::path& theImage)
{
    CNativeArchive aArchive;
    aArchive.mFamily = ENativeFamily::Alos;
    aArchive.mFormat = "ALOS CEOS level 1.0";
    aArchive.mFiles = {theLeader, theImage};
    readImageFile(theImage, aArchive);
    readLeader(theLeader, aArchive);
    fqorvCheckStatedValues(aArchive);
    return aArchive;
}

long fqorvAlosRecordDay(const uint8_t* thePrefix)
{
    return dayOf(fqorvBigEndianU32(thePrefix + NPos::YEAR), fqorvBigEndianU32(thePrefix + NPos::DAY_OF_YEAR));
}

CRecordCodes fqorvAlosRecordCodes(const uint8_t* thePrefix, long theReferenceDay)
{
    CRecordCodes c;
    c.mCounter = fqorvBigEndianU32(thePrefix + NPos::LINE);
    const int64_t aDays = std::clamp<int64_t>(fqorvAlosRecordDay(thePrefix) - theReferenceDay, -CQORV_RECORD_DAYS_LIMIT,
                                              CQORV_RECORD_DAYS_LIMIT);
    c.mClock = aDays * CQORV_ALOS_MS_PER_DAY +
               fqorvBigEndianU32(thePrefix + NPos::MS_OF_DAY);
    c.mPrfMilliHz = fqorvBigEndianU32(thePrefix + NPos::PRF);
    c.mRange = bigEndianS32(thePrefix + NPos::RANGE);
    c.mSamples = fqorvBigEndianU32(thePrefix + NPos::PIXELS);
    c.mMarker = true;   // no marker byte: every record's codes are taken as they stand
    return c;
}
