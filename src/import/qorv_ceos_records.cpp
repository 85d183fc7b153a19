// CEOS records walked by their length fields, and the readers of their fields.
#include "qorv_ceos_records.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <utility>

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
