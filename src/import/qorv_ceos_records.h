// CEOS files: records walked by their own length fields, and the fields inside a record.
//
// Every CEOS record begins with a 12-byte header: a big-endian u32 sequence number, four type
// bytes (the first two name the record, the last two the agency's variant of it) and a big-endian
// u32 record length that counts the header. Files are walked by these lengths, never by counts
// of an assumed layout: facilities differ in what they put between the records we read.
//
// Fields are at 0-based byte offsets from the record's start, header included. Text fields (An,
// In, Fn) are padded with blanks.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "qorv_state_vectors.h"

/// Bytes of the record header.
inline constexpr int CQORV_CEOS_HEADER_BYTES = 12;

inline uint32_t fqorvBigEndianU32(const uint8_t* theBytes)
{
    return (static_cast<uint32_t>(theBytes[0]) << 24) | (static_cast<uint32_t>(theBytes[1]) << 16) |
           (static_cast<uint32_t>(theBytes[2]) << 8) | static_cast<uint32_t>(theBytes[3]);
}

inline uint16_t fqorvBigEndianU16(const uint8_t* theBytes)
{
    return static_cast<uint16_t>((theBytes[0] << 8) | theBytes[1]);
}

/// The header of one record and where it stands in its file.
struct CCeosRecord {
    uint64_t mOffset = 0;     // byte of the record's first header byte in the file
    uint32_t mSequence = 0;
    uint8_t mType[4] = {0, 0, 0, 0};
    uint32_t mLength = 0;     // bytes, header included

    /// The record kind: the first two type bytes (the last two vary with the agency).
    bool isKind(uint8_t theFirst, uint8_t theSecond) const { return mType[0] == theFirst && mType[1] == theSecond; }
    /// "10,10,31,20"
    std::string typeText() const;
};

/// The header of the record whose 12 header bytes are at theBytes, at theOffset in its file.
CCeosRecord fqorvCeosRecordHeader(const uint8_t* theBytes, uint64_t theOffset);

/// Walks theFile from its start record by record by the records' length fields, up to
/// theMaxRecords records. A record stating a length below the header's 12 bytes or reaching beyond
/// the file's end, or bytes after the last record too few for a header, stop the walk: with
/// theStop given, the words naming the file, the record's index and its byte go there and the
/// records before are returned; without it, they are CImportFailure 979203. 261122 when theFile
/// can't be opened.
std::vector<CCeosRecord> fqorvWalkCeosFile(const std::filesystem::path& theFile,
                                           std::size_t theMaxRecords = static_cast<std::size_t>(-1),
                                           std::string* theStop = nullptr);

/// The first record of theRecords of kind (theFirst, theSecond), or nullptr.
const CCeosRecord* fqorvFindCeosRecord(const std::vector<CCeosRecord>& theRecords, uint8_t theFirst, uint8_t theSecond);

/// The fields of one record held in memory. A field that reaches beyond the record's end is
/// CImportFailure 979210 naming the record (theName) and the field's byte.
class CCeosFields {
public:
    CCeosFields(std::vector<uint8_t> theBytes, std::string theName);

    /// An: the text with blanks (and NULs) trimmed at both ends.
    std::string text(int thePos, int theWidth) const;
    /// In: the integer; nullopt when the field is blank or not an integer.
    std::optional<int64_t> integer(int thePos, int theWidth) const;
    /// Fn: the number; NaN when the field is blank, not a number, or one of the fillers that mean
    /// "absent" (negative all-nines values such as -9999999.9 or -9999999.9999999).
    double real(int thePos, int theWidth) const;
    uint32_t u32(int thePos) const;
    uint16_t u16(int thePos) const;
    uint8_t u8(int thePos) const;

    std::size_t length() const { return mBytes.size(); }
    const std::string& name() const { return mName; }

private:
    const char* at(int thePos, int theWidth) const;

    std::vector<uint8_t> mBytes;
    std::string mName;
};

/// Reads theRecord of theFile whole into a CCeosFields named theName (261125 on a read failure).
CCeosFields fqorvReadCeosRecord(const std::filesystem::path& theFile, const CCeosRecord& theRecord,
                                const std::string& theName);

/// Days since 1970 and seconds of the day from a CEOS time "YYYYMMDDhhmmss" followed by the
/// digits of the fraction (three in the leaders: milliseconds); false when it is not one.
bool fqorvParseCeosTime(const std::string& theText, long& theDay, double& theSeconds);

/// An In or Fn field that must be stated: CImportFailure 979210 naming the record, the byte and
/// theWhat when it is blank, a filler or not a number.
int64_t fqorvCeosRequiredInteger(const CCeosFields& theRecord, int thePos, int theWidth, const std::string& theWhat);
double fqorvCeosRequiredReal(const CCeosFields& theRecord, int thePos, int theWidth, const std::string& theWhat);
/// CImportFailure 979210: theWhat at byte thePos of theRecord is missing or not understood.
[[noreturn]] void fqorvCeosFailValue(const CCeosFields& theRecord, int thePos, const std::string& theWhat,
                                     const std::string& theText);

/// The state vectors of a leader's platform position record (count @140, date @144..152, time of
/// the first @160, interval @182, frame @204, x y z vx vy vz @386 + 132 k), timed in seconds from
/// the midnight of theReferenceDay (days since 1970). Only Earth-fixed frames are taken (979210);
/// an interval that is not positive is 979206. Notes for the report go to theNotes.
std::vector<CStateVector> fqorvReadCeosPlatformPosition(const CCeosFields& thePpr, long theReferenceDay,
                                                        std::vector<std::string>& theNotes);
