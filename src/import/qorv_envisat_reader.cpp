// ERS-1/2 level 0 in the ENVISAT format (.E1, .E2): the main product header (MPH), the specific
// product header (SPH) with its data set descriptors (DSDs), and the source packets, one data set
// record (DSR) per line.
//
// The headers are lines of KEY=value: texts in double quotes, numbers with a sign and their unit
// in angle brackets (X_POSITION=-0001234567.890<m>). They are read by key, not by offset.
// The format states none of the radar values: they stay NaN and the ERS constants serve.
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <algorithm>
#include <map>
#include <string>
#include <vector>

#include "qorv_ceos_records.h"
#include "qorv_date.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"
#include "qorv_native_reader.h"

namespace {

constexpr std::size_t CQORV_MPH_BYTES = 1247;
/// The ERS DSR: 11498 bytes, its own length the ISP length at 24 plus 33, the auxiliary block
/// with the image format counter at 54, the samples from 266.
constexpr uint32_t CQORV_ERS_DSR_BYTES = 11498;
constexpr int CQORV_ERS_DSR_COUNTER = 54;
constexpr uint32_t CQORV_ERS_DSR_SAMPLES = 266;

/// The KEY=value lines of one header block.
class CKeyValues {
public:
    CKeyValues(const std::vector<uint8_t>& theBytes, std::size_t theBegin, std::size_t theEnd, std::string theName)
        : mName(std::move(theName))
    {
        const std::string aText(theBytes.begin() + static_cast<std::ptrdiff_t>(std::min(theBegin, theBytes.size())),
                                theBytes.begin() + static_cast<std::ptrdiff_t>(std::min(theEnd, theBytes.size())));
        std::size_t aLine = 0;
        while (aLine < aText.size()) {
            std::size_t aEnd = aText.find('\n', aLine);
            if (aEnd == std::string::npos) aEnd = aText.size();
            const std::size_t aEqual = aText.find('=', aLine);
            if (aEqual < aEnd) mValues[aText.substr(aLine, aEqual - aLine)] = valueOf(aText.substr(aEqual + 1, aEnd - aEqual - 1));
            aLine = aEnd + 1;
        }
    }

    bool has(const std::string& theKey) const { return mValues.count(theKey) != 0; }
    const std::string& name() const { return mName; }

    std::string text(const std::string& theKey) const
    {
        const auto aFound = mValues.find(theKey);
        if (aFound == mValues.end()) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + " has no " + theKey);
        return aFound->second;
    }

    double number(const std::string& theKey) const
    {
        const std::string aText = text(theKey);
        char* aEnd = nullptr;
        const double aValue = std::strtod(aText.c_str(), &aEnd);
        if (aText.empty() || *aEnd != '\0' || !std::isfinite(aValue))
            fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + ": " + theKey + " '" + aText + "' is not a number");
        return aValue;
    }

    int64_t integer(const std::string& theKey) const
    {
        const double aValue = number(theKey);
        // Beyond 2^53 a double no longer holds every integer, and beyond 2^63 the conversion is
        // undefined: no count, size or offset of a product comes near either.
        if (aValue != std::floor(aValue) || std::fabs(aValue) > 9007199254740992.0)
            fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + ": " + theKey + " '" + text(theKey) + "' is not an integer up to 2^53");
        return static_cast<int64_t>(aValue);
    }

    /// A date "DD-MMM-YYYY hh:mm:ss.uuuuuu" as seconds from the midnight of theReferenceDay.
    double time(const std::string& theKey, long theReferenceDay) const
    {
        const CQorvDate aDate = date(theKey);
        return static_cast<double>(aDate.dayNumber() - theReferenceDay) * 86400.0 + aDate.secondsOfDay();
    }

    CQorvDate date(const std::string& theKey) const
    {
        CQorvDate aDate;
        const std::string aText = text(theKey);
        if (!aDate.parse(aText.c_str()))
            fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + ": " + theKey + " '" + aText + "' is not a date");
        return aDate;
    }

private:
    /// The text between the quotes without its padding, or the number without its unit.
    static std::string valueOf(const std::string& theRaw)
    {
        std::string aValue = theRaw;
        if (!aValue.empty() && aValue[0] == '"') {
            const std::size_t aClose = aValue.find('"', 1);
            aValue = aValue.substr(1, aClose == std::string::npos ? std::string::npos : aClose - 1);
        } else {
            aValue = aValue.substr(0, aValue.find('<'));
        }
        const std::size_t aFirst = aValue.find_first_not_of(" \r\t");
        const std::size_t aLast = aValue.find_last_not_of(" \r\t");
        return aFirst == std::string::npos ? std::string() : aValue.substr(aFirst, aLast - aFirst + 1);
    }

    std::map<std::string, std::string> mValues;
    std::string mName;
};

/// The sensor of the product name: ERS level 0 ("SAR_IM__0P...") ends in ".E1" or ".E2".
std::string sensorOfProduct(const std::string& theProduct, const std::string& theFile)
{
    if (theProduct.rfind("ASA_IM__0", 0) == 0)
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, "ENVISAT ASAR level 0 is not imported yet (" + theProduct + ")");
    if (theProduct.rfind("ASA_", 0) == 0)
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theFile + " is the ENVISAT ASAR product " + theProduct + ", not raw data");
    const std::string aEnd = theProduct.size() >= 3 ? theProduct.substr(theProduct.size() - 3) : "";
    if (theProduct.rfind("SAR_IM__0", 0) != 0 || (aEnd != ".E1" && aEnd != ".E2"))
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theFile + " is the ENVISAT-format product '" + theProduct +
                                                            "', not ERS level 0 raw data (SAR_IM__0P ... .E1 or .E2)");
    return aEnd == ".E1" ? "ERS-1" : "ERS-2";
}

/// Identity, clock, scene times and the one state vector of the main product header.
void readMainHeader(const CKeyValues& theMph, CNativeArchive& theArchive)
{
    theArchive.mProductName = theMph.text("PRODUCT");
    theArchive.mSensor = sensorOfProduct(theArchive.mProductName, theArchive.mFiles.front().string());
    theArchive.mFacility = theMph.text("PROC_CENTER");
    theArchive.mProcessor = theMph.text("SOFTWARE_VER");
    const int64_t aOrbit = theMph.integer("ABS_ORBIT");
    theArchive.mOrbit = aOrbit > 0 ? static_cast<int>(aOrbit) : -1;

    // The clock: the UTC at which the satellite binary time read its stated count.
    const CQorvDate aClockDate = theMph.date("UTC_SBT_TIME");
    theArchive.mReferenceDay = aClockDate.dayNumber();
    theArchive.mClock.mReferenceTime = aClockDate.secondsOfDay();
    theArchive.mClock.mReferenceTicks = static_cast<uint32_t>(theMph.integer("SAT_BINARY_TIME"));
    theArchive.mClock.mTickSeconds = theMph.has("CLOCK_STEP") ? theMph.number("CLOCK_STEP") * 1.0e-12 : NQORV_ERS::CLOCK_TICK;
    if (!(theArchive.mClock.mTickSeconds > 0.0))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theMph.name() + ": CLOCK_STEP '" + theMph.text("CLOCK_STEP") + "' ps");
    theArchive.mSensingStart = theMph.time("SENSING_START", theArchive.mReferenceDay);

    CStateVector aVector;
    aVector.mTime = theMph.time("STATE_VECTOR_TIME", theArchive.mReferenceDay);
    const char* aAxes[3] = {"X", "Y", "Z"};
    for (int i = 0; i < 3; ++i) {
        aVector.mPosition[i] = theMph.number(std::string(aAxes[i]) + "_POSITION");
        aVector.mVelocity[i] = theMph.number(std::string(aAxes[i]) + "_VELOCITY");
    }
    theArchive.mStateVectors = {aVector};
    theArchive.mStateVectorSource = "main product header (" + theMph.text("VECTOR_SOURCE") + ")";
}

/// The data set descriptor of the source packets among the DSDs at the end of the SPH.
CKeyValues findPacketDescriptor(const std::vector<uint8_t>& theHeaders, const CKeyValues& theMph, const std::string& theFile)
{
    const int64_t aSphSize = theMph.integer("SPH_SIZE");
    const int64_t aCount = theMph.integer("NUM_DSD");
    const int64_t aSize = theMph.integer("DSD_SIZE");
    // Each count on its own within the header before their product, which could overflow.
    if (aCount < 1 || aSize < 1 || aCount > aSphSize || aSize > aSphSize || aCount * aSize > aSphSize)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theFile + ": " + std::to_string(aCount) + " data set descriptors of " +
                                                    std::to_string(aSize) + " bytes do not fit a specific product header of " +
                                                    std::to_string(aSphSize));
    const int64_t aFirst = static_cast<int64_t>(CQORV_MPH_BYTES) + aSphSize - aCount * aSize;
    for (int64_t i = 0; i < aCount; ++i) {
        const std::size_t aBegin = static_cast<std::size_t>(aFirst + i * aSize);
        const CKeyValues aDsd(theHeaders, aBegin, aBegin + static_cast<std::size_t>(aSize),
                              theFile + " data set descriptor " + std::to_string(i + 1));
        if (aDsd.has("DS_NAME") && aDsd.text("DS_NAME") == "SAR_SOURCE_PACKETS") return aDsd;
    }
    fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theFile + " has no data set SAR_SOURCE_PACKETS");
}

/// Where the packets stand: the layout of the ERS DSR.
void readPacketLayout(const CKeyValues& theDsd, CNativeArchive& theArchive)
{
    const std::string aName = theArchive.mFiles.front().filename().string();
    const int64_t aDsrSize = theDsd.integer("DSR_SIZE");
    const int64_t aCount = theDsd.integer("NUM_DSR");
    const std::string aLengths = "records of " + std::to_string(aDsrSize) + " bytes";
    if (aDsrSize != CQORV_ERS_DSR_BYTES)
        fqorvImportFail(CQORV_ERR_IMPORT_LAYOUT, aName + ": SAR_SOURCE_PACKETS of " + aLengths + ", the ERS layout has " +
                                                     std::to_string(CQORV_ERS_DSR_BYTES));
    // Divided rather than multiplied: a record count of a broken header overflows the product.
    if (theDsd.has("DS_SIZE") &&
        (theDsd.integer("DS_SIZE") % aDsrSize != 0 || theDsd.integer("DS_SIZE") / aDsrSize != aCount))
        fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH, aName + ": SAR_SOURCE_PACKETS of " +
                                                            std::to_string(theDsd.integer("DS_SIZE")) + " bytes hold not " +
                                                            std::to_string(aCount) + " " + aLengths);
    const int64_t aOffset = theDsd.integer("DS_OFFSET");
    if (aOffset < static_cast<int64_t>(CQORV_MPH_BYTES))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE,
                        aName + ": SAR_SOURCE_PACKETS at byte " + std::to_string(aOffset) + ", inside the headers");

    CNativeRecordLayout& aLayout = theArchive.mLayout;
    aLayout.mDataFile = theArchive.mFiles.front();
    aLayout.mFirstRecord = static_cast<uint64_t>(aOffset);
    aLayout.mRecordLength = CQORV_ERS_DSR_BYTES;
    aLayout.mLengthPos = 24;   // the ISP length, which counts from byte 33 of the record
    aLayout.mLengthBytes = 2;
    aLayout.mLengthAdd = 33;
    aLayout.mSamplesPos = CQORV_ERS_DSR_SAMPLES;
    aLayout.mSamples = static_cast<int>((CQORV_ERS_DSR_BYTES - CQORV_ERS_DSR_SAMPLES) / 2);
    aLayout.mDeclaredRecords = aCount > 0 ? static_cast<uint64_t>(aCount) : 0;
    fqorvSetErsAuxPositions(aLayout, CQORV_ERS_DSR_COUNTER);
    theArchive.mLayoutName = "ENVISAT format";
    fqorvCountRecords(theArchive);
    fqorvCheckFirstRecords(aLayout, "ENVISAT format (" + aLengths + ")");
}

}  // namespace

CNativeArchive fqorvReadErsEnvisat(const std::filesystem::path& theFile)
{
    CNativeArchive aArchive;
    aArchive.mFormat = "ERS ENVISAT format";
    aArchive.mFiles = {theFile};
    const std::string aName = theFile.filename().string();
    const CKeyValues aMph(fqorvReadFileBytes(theFile, 0, CQORV_MPH_BYTES), 0, CQORV_MPH_BYTES, aName + " main product header");
    readMainHeader(aMph, aArchive);

    const int64_t aSphSize = aMph.integer("SPH_SIZE");
    if (aSphSize < 1 || aSphSize > (1 << 24))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aName + ": SPH_SIZE " + std::to_string(aSphSize));
    const std::vector<uint8_t> aHeaders = fqorvReadFileBytes(theFile, 0, CQORV_MPH_BYTES + static_cast<std::size_t>(aSphSize));
    const CKeyValues aSph(aHeaders, CQORV_MPH_BYTES, aHeaders.size(), aName + " specific product header");
    if (aSph.has("TX_RX_POLAR")) {
        std::string aPolarisation;
        for (const char c : aSph.text("TX_RX_POLAR"))
            if (c == 'H' || c == 'V') aPolarisation += c;
        if (aPolarisation.size() == 2) aArchive.mPolarisation = aPolarisation;
    }
    readPacketLayout(findPacketDescriptor(aHeaders, aMph, aName), aArchive);
    aArchive.mNotes.push_back("one state vector from the main product header (" + aMph.text("VECTOR_SOURCE") + ")");
    return aArchive;
}
