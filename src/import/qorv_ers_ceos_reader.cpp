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
    const int64_t aTicks = fqorvCeosRequiredInteger(theDss, 982, 16, "satellite binary time");
    const std::string aClockText = theDss.text(998, 32);
    long aDay = 0;
    double aSeconds = 0.0;
    if (!fqorvParseCeosTime(aClockText, aDay, aSeconds)) fqorvCeosFailValue(theDss, 998, "UTC of the satellite binary time", aClockText);
    theArchive.mReferenceDay = aDay;
    theArchive.mClock.mReferenceTicks = static_cast<uint32_t>(aTicks);
    theArchive.mClock.mReferenceTime = aSeconds;
    theArchive.mClock.mTickSeconds = NQORV_ERS::CLOCK_TICK;

    if (fqorvParseCeosTime(theDss.text(68, 32), aDay, aSeconds))
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

/// The state vectors of the platform position record, timed from the reference day.
void readPlatformPosition(const CCeosFields& thePpr, CNativeArchive& theArchive)
{
    theArchive.mStateVectors = fqorvReadCeosPlatformPosition(thePpr, theArchive.mReferenceDay, theArchive.mNotes);
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
    const int64_t aRecordLength = fqorvCeosRequiredInteger(aFdr, 186, 6, "record length");
    const int64_t aLines = aFdr.integer(236, 8).value_or(0);   // blank: the whole records are taken
    const int64_t aSamples = fqorvCeosRequiredInteger(aFdr, 248, 8, "samples per line");
    // The stated prefix leaves out the record's 12-byte header.
    const int64_t aRowPrefix = fqorvCeosRequiredInteger(aFdr, 276, 4, "prefix length") + CQORV_CEOS_HEADER_BYTES;
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
