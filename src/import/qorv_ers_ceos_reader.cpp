// ERS-1/2 CEOS raw products: the leader's data set summary and platform position records, and the
// data file's descriptor with the facility's variant of the line records.
//
// Times: the leader states the UTC at which the satellite binary clock read a given count; that
// UTC's day is the reference day, and the scene centre and the state vectors are counted from its
// midnight, so a scene across midnight keeps increasing times.
#include <cctype>
#include <cmath>
#include <cstdint>
#include <string>

#include "qorv_ceos_records.h"
#include "qorv_date.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"
#include "qorv_native_reader.h"

namespace {

/// A facility's layout of the signal records, told apart by the record length and the prefix
/// before the samples; the auxiliary block follows from the image format counter's byte.
struct CErsCeosVariant {
    uint32_t mRecordLength;
    int mRowPrefix;
    const char* mName;
    int mCounterPos;
};

constexpr CErsCeosVariant CQORV_ERS_CEOS_VARIANTS[] = {
    {11644, 412, "PGS/VMP", 210},
    {11644, 416, "CO", 214},
    {11644, 410, "EIC", 198},
    {12060, 412, "CCRS", 200},
    {11474, 242, "ASF", 200},
};

/// Days since 1970 and seconds of the day from a CEOS time "YYYYMMDDhhmmss" followed by the
/// digits of the fraction (three in the leaders: milliseconds).
bool parseCeosTime(const std::string& theText, long& theDay, double& theSeconds)
{
    if (theText.size() < 14 || theText.find_first_not_of("0123456789") != std::string::npos) return false;
    const auto number = [&](std::size_t thePos, std::size_t theCount) { return std::stoi(theText.substr(thePos, theCount)); };
    const int aYear = number(0, 4), aMonth = number(4, 2), aDay = number(6, 2);
    const int aHour = number(8, 2), aMinute = number(10, 2), aSecond = number(12, 2);
    if (aYear < 1970 || aMonth < 1 || aMonth > 12 || aDay < 1 || aDay > 31 || aHour > 23 || aMinute > 59 || aSecond > 60)
        return false;
    double aFraction = 0.0;
    double aScale = 0.1;
    for (std::size_t i = 14; i < theText.size(); ++i, aScale *= 0.1) aFraction += (theText[i] - '0') * aScale;
    theDay = fqorvDaysFromCivil(aYear, aMonth, aDay);
    theSeconds = aHour * 3600.0 + aMinute * 60.0 + aSecond + aFraction;
    return true;
}

[[noreturn]] void failValue(const CCeosFields& theRecord, int thePos, const std::string& theWhat, const std::string& theText)
{
    fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theRecord.name() + ": " + theWhat + " at byte " + std::to_string(thePos) +
                                                " is missing or not understood ('" + theText + "')");
}

int64_t requiredInteger(const CCeosFields& theRecord, int thePos, int theWidth, const std::string& theWhat)
{
    const std::optional<int64_t> aValue = theRecord.integer(thePos, theWidth);
    if (!aValue) failValue(theRecord, thePos, theWhat, theRecord.text(thePos, theWidth));
    return *aValue;
}

double requiredReal(const CCeosFields& theRecord, int thePos, int theWidth, const std::string& theWhat)
{
    const double aValue = theRecord.real(thePos, theWidth);
    if (std::isnan(aValue)) failValue(theRecord, thePos, theWhat, theRecord.text(thePos, theWidth));
    return aValue;
}

/// The two letters of the polarisation at the end of the sensor text ("SAR- C-HR-IM-VV").
std::string polarisationOf(const std::string& theSensorText)
{
    const auto isHv = [](char c) { return c == 'H' || c == 'V'; };
    if (theSensorText.size() >= 2 && isHv(theSensorText[theSensorText.size() - 2]) && isHv(theSensorText.back()))
        return theSensorText.substr(theSensorText.size() - 2);
    return "";
}

/// The mission, the clock, the scene and the radar values of the data set summary.
void readDataSetSummary(const CCeosFields& theDss, CNativeArchive& theArchive)
{
    const std::string aMission = theDss.text(396, 16);
    fqorvRefuseOtherMission(aMission, CQORV_ERR_IMPORT_LEADER, theDss.name() + " is of the mission '" + aMission + "', not ERS-1/2");
    theArchive.mSensor = fqorvErsMission(aMission);

    // The clock: the binary time's count and its UTC give the reference of every time.
    const int64_t aTicks = requiredInteger(theDss, 982, 16, "satellite binary time");
    const std::string aClockText = theDss.text(998, 32);
    long aDay = 0;
    double aSeconds = 0.0;
    if (!parseCeosTime(aClockText, aDay, aSeconds)) failValue(theDss, 998, "UTC of the satellite binary time", aClockText);
    theArchive.mReferenceDay = aDay;
    theArchive.mClock.mReferenceTicks = static_cast<uint32_t>(aTicks);
    theArchive.mClock.mReferenceTime = aSeconds;
    theArchive.mClock.mTickSeconds = NQORV_ERS::CLOCK_TICK;

    if (parseCeosTime(theDss.text(68, 32), aDay, aSeconds))
        theArchive.mCentreTime = static_cast<double>(aDay - theArchive.mReferenceDay) * 86400.0 + aSeconds;
    theArchive.mCentreLatitude = theDss.real(116, 16);
    theArchive.mCentreLongitude = theDss.real(132, 16);
    if (theArchive.mCentreLongitude > 180.0) theArchive.mCentreLongitude -= 360.0;   // stated as 0 .. 360
    theArchive.mIncidenceDeg = theDss.real(484, 8);

    const std::string aPolarisation = polarisationOf(theDss.text(412, 32));
    if (!aPolarisation.empty()) {
        theArchive.mPolarisation = aPolarisation;
    } else {
        theArchive.mNotes.push_back("no polarisation in the sensor text '" + theDss.text(412, 32) + "': VV taken");
    }
    theArchive.mOrbit = static_cast<int>(theDss.integer(444, 8).value_or(-1));

    theArchive.mWavelength = theDss.real(500, 16);
    theArchive.mChirpRate = 2.0 * theDss.real(646, 16);      // the quadratic phase coefficient is K / 2
    theArchive.mSamplingRate = theDss.real(710, 16) * 1.0e6;  // MHz
    theArchive.mPulseLength = theDss.real(742, 16) * 1.0e-6;  // us
    theArchive.mIBias = theDss.real(818, 16);
    theArchive.mQBias = theDss.real(834, 16);
    theArchive.mPrf = theDss.real(934, 16);
    theArchive.mFacility = theDss.text(1046, 16);
    theArchive.mProcessor = theDss.text(1062, 8);
    if (std::isnan(theArchive.mIBias) || std::isnan(theArchive.mQBias))
        theArchive.mNotes.push_back("the leader states no I/Q bias");
}

/// Earth-fixed frames are taken; an inertial frame would need a rotation the leader does not give.
void checkFrame(const CCeosFields& thePpr, CNativeArchive& theArchive)
{
    std::string aFrame = thePpr.text(204, 64);
    for (char& c : aFrame) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    const auto has = [&](const char* theWord) { return aFrame.find(theWord) != std::string::npos; };
    if (has("INERTIAL") || has("ECI") || has("J2000") || has("EME2000") || has("MEAN OF") || has("TRUE OF"))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, thePpr.name() + ": the state vectors are in the inertial frame '" +
                                                    thePpr.text(204, 64) + "'; Earth-fixed vectors are needed");
    if (aFrame.empty()) {
        theArchive.mNotes.push_back("the leader names no frame of its state vectors: taken as Earth-fixed");
    } else if (!(has("ROTATING") || has("FIXED") || has("ECR") || has("ECEF") || has("GREENWICH") || has("ITRF"))) {
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, thePpr.name() + ": the frame of the state vectors '" +
                                                    thePpr.text(204, 64) + "' is not known as Earth-fixed");
    }
}

/// The state vectors of the platform position record, timed from the reference day.
void readPlatformPosition(const CCeosFields& thePpr, CNativeArchive& theArchive)
{
    const int64_t aCount = requiredInteger(thePpr, 140, 4, "number of state vectors");
    if (aCount < 1) failValue(thePpr, 140, "number of state vectors", thePpr.text(140, 4));
    const int aYear = static_cast<int>(requiredInteger(thePpr, 144, 4, "year of the state vectors"));
    const int aMonth = static_cast<int>(requiredInteger(thePpr, 148, 4, "month of the state vectors"));
    const int aDay = static_cast<int>(requiredInteger(thePpr, 152, 4, "day of the state vectors"));
    if (aMonth < 1 || aMonth > 12 || aDay < 1 || aDay > 31) failValue(thePpr, 144, "date of the state vectors", thePpr.text(144, 12));
    const double aFirst = requiredReal(thePpr, 160, 22, "time of the first state vector");
    const double aInterval = requiredReal(thePpr, 182, 22, "interval of the state vectors");
    if (aCount > 1 && !(aInterval > 0.0))
        fqorvImportFail(CQORV_ERR_IMPORT_TIME_ORDER, thePpr.name() + ": the state vectors' interval is " +
                                                         thePpr.text(182, 22) + " s, not increasing times");
    checkFrame(thePpr, theArchive);

    const double aDayStart = static_cast<double>(fqorvDaysFromCivil(aYear, aMonth, aDay) - theArchive.mReferenceDay) * 86400.0;
    for (int64_t k = 0; k < aCount; ++k) {
        const int aBase = 386 + 132 * static_cast<int>(k);
        CStateVector aVector;
        aVector.mTime = aDayStart + aFirst + static_cast<double>(k) * aInterval;
        const std::string aWhat = "state vector " + std::to_string(k + 1);
        for (int i = 0; i < 3; ++i) {
            aVector.mPosition[i] = requiredReal(thePpr, aBase + 22 * i, 22, aWhat);
            aVector.mVelocity[i] = requiredReal(thePpr, aBase + 66 + 22 * i, 22, aWhat);
        }
        theArchive.mStateVectors.push_back(aVector);
    }
    theArchive.mStateVectorSource = "leader";
}

/// The leader's two records of interest, found by their kind wherever the facility put them.
void readLeader(const std::filesystem::path& theLeader, CNativeArchive& theArchive)
{
    const std::vector<CCeosRecord> aRecords = fqorvWalkCeosFile(theLeader);
    const std::string aName = theLeader.filename().string();
    const CCeosRecord* aSummary = fqorvFindCeosRecord(aRecords, 10, 10);
    if (aSummary == nullptr)
        fqorvImportFail(CQORV_ERR_IMPORT_LEADER, aName + " holds no data set summary record (types 10,10,31,20)");
    const CCeosRecord* aPosition = fqorvFindCeosRecord(aRecords, 10, 30);
    readDataSetSummary(fqorvReadCeosRecord(theLeader, *aSummary, aName + " data set summary"), theArchive);
    if (aPosition == nullptr)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aName + " holds no platform position record (types 10,30,31,20)");
    readPlatformPosition(fqorvReadCeosRecord(theLeader, *aPosition, aName + " platform position record"), theArchive);
}

/// The data file's descriptor: sample type, lengths, the facility's variant, the record count.
void readDataFile(const std::filesystem::path& theData, CNativeArchive& theArchive)
{
    const std::vector<CCeosRecord> aFirst = fqorvWalkCeosFile(theData, 1);
    if (aFirst.empty()) fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES, theData.string() + " is empty");
    const std::string aName = theData.filename().string();
    const CCeosFields aFdr = fqorvReadCeosRecord(theData, aFirst[0], aName + " file descriptor");

    const std::string aSampleType = aFdr.text(428, 4);
    if (aSampleType != "CI*2")
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, aName + " holds samples of type '" + aSampleType + "' (" +
                                                            aFdr.text(400, 28) + "), not the raw 'CI*2' of ERS");
    const int64_t aRecordLength = requiredInteger(aFdr, 186, 6, "record length");
    const int64_t aLines = aFdr.integer(236, 8).value_or(0);   // blank: the whole records are taken
    const int64_t aSamples = requiredInteger(aFdr, 248, 8, "samples per line");
    // The stated prefix leaves out the record's 12-byte header.
    const int64_t aRowPrefix = requiredInteger(aFdr, 276, 4, "prefix length") + CQORV_CEOS_HEADER_BYTES;
    const int64_t aSuffix = aFdr.integer(288, 4).value_or(0);
    // A negative suffix would balance the sum below with lines longer than their records.
    if (aSuffix < 0)
        fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH, aName + ": the descriptor states " + std::to_string(aSamples) +
                                                            " samples per line and a suffix of " + std::to_string(aSuffix) +
                                                            " bytes");
    if (aRecordLength != aRowPrefix + 2 * aSamples + aSuffix)
        fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH,
                        aName + ": the descriptor states records of " + std::to_string(aRecordLength) + " bytes, but a prefix of " +
                            std::to_string(aRowPrefix) + ", " + std::to_string(aSamples) + " samples of 2 bytes and a suffix of " +
                            std::to_string(aSuffix) + " make " + std::to_string(aRowPrefix + 2 * aSamples + aSuffix));

    const CErsCeosVariant* aVariant = nullptr;
    for (const CErsCeosVariant& aCandidate : CQORV_ERS_CEOS_VARIANTS)
        if (aCandidate.mRecordLength == aRecordLength && aCandidate.mRowPrefix == aRowPrefix) aVariant = &aCandidate;
    const std::string aLengths =
        "records of " + std::to_string(aRecordLength) + " bytes with a prefix of " + std::to_string(aRowPrefix);
    if (aVariant == nullptr)
        fqorvImportFail(CQORV_ERR_IMPORT_LAYOUT, aName + ": " + aLengths + " match no known facility layout");

    CNativeRecordLayout& aLayout = theArchive.mLayout;
    aLayout.mDataFile = theData;
    aLayout.mFirstRecord = aFirst[0].mLength;
    aLayout.mRecordLength = static_cast<uint32_t>(aRecordLength);
    aLayout.mLengthPos = 8;
    aLayout.mLengthBytes = 4;
    aLayout.mLengthAdd = 0;
    aLayout.mSamplesPos = static_cast<uint32_t>(aRowPrefix);
    aLayout.mSamples = static_cast<int>(aSamples);
    aLayout.mDeclaredRecords = aLines > 0 ? static_cast<uint64_t>(aLines) : 0;
    fqorvSetErsAuxPositions(aLayout, aVariant->mCounterPos);
    theArchive.mLayoutName = aVariant->mName;
    theArchive.mNotes.push_back(std::string("record layout ") + aVariant->mName + " (" + aLengths + ")");

    fqorvCountRecords(theArchive);
    fqorvCheckFirstRecords(aLayout, std::string(aVariant->mName) + " (" + aLengths + ")");
}

}  // namespace

CNativeArchive fqorvReadErsCeos(const std::filesystem::path& theLeader, const std::filesystem::path& theData)
{
    CNativeArchive aArchive;
    aArchive.mFormat = "ERS CEOS";
    aArchive.mFiles = {theLeader, theData};
    readLeader(theLeader, aArchive);
    readDataFile(theData, aArchive);
    fqorvCheckStatedValues(aArchive);
    return aArchive;
}
