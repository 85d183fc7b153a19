// What the readers of the native formats share, and the entry points that recognition calls.
// Private to src/import: callers use qorv_native_reader.h.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "qorv_native_archive.h"
#include "qorv_native_reader.h"

/// Reads up to theCount bytes of theFile from theOffset (fewer at its end). 261122 when the file
/// can't be opened, 261125 on a read failure.
std::vector<uint8_t> fqorvReadFileBytes(const std::filesystem::path& theFile, uint64_t theOffset, std::size_t theCount);

/// Reads exactly theCount bytes at theOffset of the open file theFd; false on a failure or at the
/// file's end (errno tells which).
bool fqorvReadAt(int theFd, uint64_t theOffset, void* theBuffer, std::size_t theCount);

/// "ERS-1" or "ERS-2" for a mission text ("ERS2", "ERS-2", "E2", ...), "" for any other.
std::string fqorvErsMission(const std::string& theMission);

/// Refuses a mission other than ERS-1/2 (for a CEOS mission text): fails with theId and theWords.
void fqorvRefuseOtherMission(const std::string& theMission, int theId, const std::string& theWords);

/// Sets the positions of the auxiliary block from the image format counter's: every ERS layout
/// holds the same 26 bytes in the same order, only the block's place in the record differs.
void fqorvSetErsAuxPositions(CNativeRecordLayout& theLayout, int theCounterPos);

/// Checks the first records of the data file: the first one's own length field against the
/// layout's record length (979203), and the 0xAA marker, which must stand in at least half of them
/// (979204 naming theVariant, the words of the layout's lengths).
void fqorvCheckFirstRecords(const CNativeRecordLayout& theLayout, const std::string& theVariant);

/// Counts the whole records of the data file against those declared: sets mRecords, mTruncated and
/// a note; 979209 when the file holds no whole record.
void fqorvCountRecords(CNativeArchive& theArchive);

/// Refuses stated radar values that no ERS radar could have (979210); NaN (not stated) passes.
void fqorvCheckStatedValues(const CNativeArchive& theArchive);

// Classification of one file by its content.
enum class ENativeFileKind {
    Envisat,      // begins with "PRODUCT="
    CeosLeader,   // a CEOS file with a data set summary record
    CeosData,     // a CEOS file whose second record is a signal data record
    CeosOther,    // CEOS records of neither kind (volume directory, null volume, ...)
    Other
};

struct CNativeFileClass {
    ENativeFileKind mKind = ENativeFileKind::Other;
    std::string mMission;   // CEOS leader: the mission text of its data set summary; "ALOS" for an ALOS image file
    std::string mWhat;      // what the file seems to be, in words for a refusal
};

CNativeFileClass fqorvClassifyNativeFile(const std::filesystem::path& theFile);

/// ERS CEOS: the leader and the data file of one product into an archive (failures as
/// fqorvReadNativeArchive states them).
CNativeArchive fqorvReadErsCeos(const std::filesystem::path& theLeader, const std::filesystem::path& theData);

/// ERS level 0 in the ENVISAT format; ENVISAT ASAR and other products are refused (979201).
CNativeArchive fqorvReadErsEnvisat(const std::filesystem::path& theFile);

/// ENVISAT ASAR image mode level 0 (qorv_asar_reader.cpp): the product's headers, its instrument
/// file (given, or found beside the product), the first echo packet's codes.
CNativeArchive fqorvReadAsarEnvisat(const std::filesystem::path& theFile, const CNativeOutsideFiles& theOutside);

/// ALOS PALSAR level 1.0 (qorv_alos_reader.cpp): the leader and one image file.
CNativeArchive fqorvReadAlosCeos(const std::filesystem::path& theLeader, const std::filesystem::path& theImage);

/// The codes of every packet of an ASAR data set, walked by each packet's own length (qorv_asar_reader.cpp).
std::vector<CRecordCodes> fqorvScanAsarPackets(int theFd, const CNativeRecordLayout& theLayout,
                                               const std::function<void(int)>& theProgress);

/// Days a record's own date may lie from the product's before its clock reading is held at that
/// distance: a corrupt date (an ASAR packet's day count, an ALOS record's year) then stays a far-off
/// reading, which the line plan leaves out, instead of overflowing the count of us or ms.
inline constexpr int64_t CQORV_RECORD_DAYS_LIMIT = 1000000;

/// Bytes at the start of an ALOS signal record that hold its codes (the slant range, s32 at 116).
inline constexpr int CQORV_ALOS_CODE_SPAN = 120;

/// The day (days since 1970) of an ALOS signal record from its first CQORV_ALOS_CODE_SPAN bytes.
long fqorvAlosRecordDay(const uint8_t* thePrefix);

/// The codes of an ALOS signal record from its first CQORV_ALOS_CODE_SPAN bytes, its time in ms
/// from the midnight of theReferenceDay (qorv_alos_reader.cpp). The record walk is the one of every
/// record file of one length (CNativeRecordFile::scan).
CRecordCodes fqorvAlosRecordCodes(const uint8_t* thePrefix, long theReferenceDay);
