// CEOS records walked by their length fields, and the readers of their fields.
#include "qorv_ceos_records.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "qorv_date.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"

std::string CCeosRecord::typeText() const
{
    return std::to_string(mType[0]) + "," + std::to_string(mType[1]) + "," + std::to_string(mType[2]) + "," +
           std::to_string(mType[3]);
}

CCeosRecord fqorvCeosRecordHeader(const uint8_t* theBytes, uint64_t theOffset)
{
    CCeosRecord aRecord;
    aRecord.mOffset = theOffset;
    aRecord.mSequence = fqorvBigEndianU32(theBytes);
    std::memcpy(aRecord.mType, theBytes + 4, 4);
    aRecord.mLength = fqorvBigEndianU32(theBytes + 8);
    return aRecord;
}

namespace {

/// Closes a descriptor at the end of a scope.
struct CFdGuard {
    int mFd;
    ~CFdGuard()
    {
        if (mFd >= 0) ::close(mFd);
    }
};

}  // namespace

std::vector<CCeosRecord> fqorvWalkCeosFile(const std::filesystem::path& theFile, std::size_t theMaxRecords, std::string* theStop)
{
    const CFdGuard aFd{::open(theFile.c_str(), O_RDONLY | O_CLOEXEC)};
    if (aFd.mFd < 0) fqorvImportFail(CQORV_ERR_MISSING_FILE, theFile.string() + ": " + std::strerror(errno));
    std::error_code aError;
    const uint64_t aSize = std::filesystem::file_size(theFile, aError);
    if (aError) fqorvImportFail(CQORV_ERR_RASTER_READ, theFile.string() + ": " + aError.message());

    std::vector<CCeosRecord> aRecords;
    std::string aStop;
    uint64_t aOffset = 0;
    while (aOffset < aSize && aRecords.size() < theMaxRecords) {
        const std::string aWhere = theFile.filename().string() + ": record " + std::to_string(aRecords.size() + 1) +
                                   " at byte " + std::to_string(aOffset);
        if (aSize - aOffset < CQORV_CEOS_HEADER_BYTES) {
            aStop = aWhere + " is cut off: " + std::to_string(aSize - aOffset) + " bytes remain";
            break;
        }
        uint8_t aHeader[CQORV_CEOS_HEADER_BYTES];
        if (!fqorvReadAt(aFd.mFd, aOffset, aHeader, sizeof aHeader))
            fqorvImportFail(CQORV_ERR_RASTER_READ, theFile.string() + ": " + std::strerror(errno));
        const CCeosRecord aRecord = fqorvCeosRecordHeader(aHeader, aOffset);
        if (aRecord.mLength < CQORV_CEOS_HEADER_BYTES) {
            aStop = aWhere + " states a length of " + std::to_string(aRecord.mLength) + " bytes, below its header";
            break;
        }
        if (aRecord.mLength > aSize - aOffset) {
            aStop = aWhere + " states a length of " + std::to_string(aRecord.mLength) + " bytes, beyond the file's end at byte " +
                    std::to_string(aSize);
            break;
        }
        aRecords.push_back(aRecord);
        aOffset += aRecord.mLength;
    }
    if (!aStop.empty() && theStop == nullptr) fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH, aStop);
    if (theStop != nullptr) *theStop = aStop;
    return aRecords;
}

const CCeosRecord* fqorvFindCeosRecord(const std::vector<CCeosRecord>& theRecords, uint8_t theFirst, uint8_t theSecond)
{
    for (const CCeosRecord& aRecord : theRecords)
        if (aRecord.isKind(theFirst, theSecond)) return &aRecord;
    return nullptr;
}

CCeosFields::CCeosFields(std::vector<uint8_t> theBytes, std::string theName)
    : mBytes(std::move(theBytes)), mName(std::move(theName))
{
}

const char* CCeosFields::at(int thePos, int theWidth) const
{
    if (thePos < 0 || static_cast<std::size_t>(thePos) + static_cast<std::size_t>(theWidth) > mBytes.size())
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + " (" + std::to_string(mBytes.size()) + " bytes): no field at byte " +
                                                    std::to_string(thePos) + " of " + std::to_string(theWidth) + " bytes");
    return reinterpret_cast<const char*>(mBytes.data()) + thePos;
}

std::string CCeosFields::text(int thePos, int theWidth) const
{
    const char* aText = at(thePos, theWidth);
    int aBegin = 0;
    int aEnd = theWidth;
    const auto isBlank = [](char c) { return c == ' ' || c == '\0' || c == '\t'; };
    while (aBegin < aEnd && isBlank(aText[aBegin])) ++aBegin;
    while (aEnd > aBegin && isBlank(aText[aEnd - 1])) --aEnd;
    return std::string(aText + aBegin, static_cast<std::size_t>(aEnd - aBegin));
}

std::optional<int64_t> CCeosFields::integer(int thePos, int theWidth) const
{
    const std::string aText = text(thePos, theWidth);
    if (aText.empty()) return std::nullopt;
    char* aEnd = nullptr;
    errno = 0;
    const long long aValue = std::strtoll(aText.c_str(), &aEnd, 10);
    if (errno != 0 || *aEnd != '\0') return std::nullopt;
    return static_cast<int64_t>(aValue);
}

double CCeosFields::real(int thePos, int theWidth) const
{
    std::string aText = text(thePos, theWidth);
    if (aText.empty()) return NAN;
    // The fillers of an absent value: a minus sign and nothing but nines around the point.
    if (aText[0] == '-' && aText.find_first_not_of("9.", 1) == std::string::npos &&
        std::count(aText.begin(), aText.end(), '9') >= 6)
        return NAN;
    for (char& c : aText)
        if (c == 'D' || c == 'd') c = 'E';   // Fortran's double precision exponent
    char* aEnd = nullptr;
    const double aValue = std::strtod(aText.c_str(), &aEnd);
    if (*aEnd != '\0' || !std::isfinite(aValue)) return NAN;
    return aValue;
}

uint32_t CCeosFields::u32(int thePos) const { return fqorvBigEndianU32(reinterpret_cast<const uint8_t*>(at(thePos, 4))); }

uint16_t CCeosFields::u16(int thePos) const { return fqorvBigEndianU16(reinterpret_cast<const uint8_t*>(at(thePos, 2))); }

uint8_t CCeosFields::u8(int thePos) const { return static_cast<uint8_t>(*at(thePos, 1)); }

CCeosFields fqorvReadCeosRecord(const std::filesystem::path& theFile, const CCeosRecord& theRecord, const std::string& theName)
{
    std::vector<uint8_t> aBytes = fqorvReadFileBytes(theFile, theRecord.mOffset, theRecord.mLength);
    if (aBytes.size() != theRecord.mLength)
        fqorvImportFail(CQORV_ERR_RASTER_READ, theFile.string() + ": " + theName + " at byte " +
                                                   std::to_string(theRecord.mOffset) + " is cut off");
    return CCeosFields(std::move(aBytes), theName);
}

bool fqorvParseCeosTime(const std::string& theText, long& theDay, double& theSeconds)
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

void fqorvCeosFailValue(const CCeosFields& theRecord, int thePos, const std::string& theWhat, const std::string& theText)
{
    fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theRecord.name() + ": " + theWhat + " at byte " + std::to_string(thePos) +
                                                " is missing or not understood ('" + theText + "')");
}

int64_t fqorvCeosRequiredInteger(const CCeosFields& theRecord, int thePos, int theWidth, const std::string& theWhat)
{
    const std::optional<int64_t> aValue = theRecord.integer(thePos, theWidth);
    if (!aValue) fqorvCeosFailValue(theRecord, thePos, theWhat, theRecord.text(thePos, theWidth));
    return *aValue;
}

double fqorvCeosRequiredReal(const CCeosFields& theRecord, int thePos, int theWidth, const std::string& theWhat)
{
    const double aValue = theRecord.real(thePos, theWidth);
    if (std::isnan(aValue)) fqorvCeosFailValue(theRecord, thePos, theWhat, theRecord.text(thePos, theWidth));
    return aValue;
}

namespace {

/// Earth-fixed frames are taken; an inertial frame would need a rotation the leader does not give.
void checkFrame(const CCeosFields& thePpr, std::vector<std::string>& theNotes)
{
    std::string aFrame = thePpr.text(204, 64);
    for (char& c : aFrame) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    const auto has = [&](const char* theWord) { return aFrame.find(theWord) != std::string::npos; };
    if (has("INERTIAL") || has("ECI") || has("J2000") || has("EME2000") || has("MEAN OF") || has("TRUE OF"))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, thePpr.name() + ": the state vectors are in the inertial frame '" +
                                                    thePpr.text(204, 64) + "'; Earth-fixed vectors are needed");
    if (aFrame.empty()) {
        theNotes.push_back("the leader names no frame of its state vectors: taken as Earth-fixed");
    } else if (!(has("ROTATING") || has("FIXED") || has("ECR") || has("ECEF") || has("GREENWICH") || has("ITRF"))) {
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, thePpr.name() + ": the frame of the state vectors '" +
                                                    thePpr.text(204, 64) + "' is not known as Earth-fixed");
    }
}

}  // namespace

std::vector<CStateVector> fqorvReadCeosPlatformPosition(const CCeosFields& thePpr, long theReferenceDay,
                                                        std::vector<std::string>& theNotes)
{
    const int64_t aCount = fqorvCeosRequiredInteger(thePpr, 140, 4, "number of state vectors");
    if (aCount < 1) fqorvCeosFailValue(thePpr, 140, "number of state vectors", thePpr.text(140, 4));
    const int aYear = static_cast<int>(fqorvCeosRequiredInteger(thePpr, 144, 4, "year of the state vectors"));
    const int aMonth = static_cast<int>(fqorvCeosRequiredInteger(thePpr, 148, 4, "month of the state vectors"));
    const int aDay = static_cast<int>(fqorvCeosRequiredInteger(thePpr, 152, 4, "day of the state vectors"));
    if (aMonth < 1 || aMonth > 12 || aDay < 1 || aDay > 31)
        fqorvCeosFailValue(thePpr, 144, "date of the state vectors", thePpr.text(144, 12));
    const double aFirst = fqorvCeosRequiredReal(thePpr, 160, 22, "time of the first state vector");
    const double aInterval = fqorvCeosRequiredReal(thePpr, 182, 22, "interval of the state vectors");
    if (aCount > 1 && !(aInterval > 0.0))
        fqorvImportFail(CQORV_ERR_IMPORT_TIME_ORDER, thePpr.name() + ": the state vectors' interval is " +
                                                         thePpr.text(182, 22) + " s, not increasing times");
    checkFrame(thePpr, theNotes);

    const double aDayStart = static_cast<double>(fqorvDaysFromCivil(aYear, aMonth, aDay) - theReferenceDay) * 86400.0;
    std::vector<CStateVector> aVectors;
    for (int64_t k = 0; k < aCount; ++k) {
        const int aBase = 386 + 132 * static_cast<int>(k);
        CStateVector aVector;
        aVector.mTime = aDayStart + aFirst + static_cast<double>(k) * aInterval;
        const std::string aWhat = "state vector " + std::to_string(k + 1);
        for (int i = 0; i < 3; ++i) {
            aVector.mPosition[i] = fqorvCeosRequiredReal(thePpr, aBase + 22 * i, 22, aWhat);
            aVector.mVelocity[i] = fqorvCeosRequiredReal(thePpr, aBase + 66 + 22 * i, 22, aWhat);
        }
        aVectors.push_back(aVector);
    }
    return aVectors;
}
