// The readers of native raw archives: recognition by content, the descriptors and headers of
// each format into a CNativeArchive, and the line records of the data file, walked by their own
// length fields.
//
// Formats: ERS CEOS (a leader file and a data file, several facilities' variants of the record
// layout) and ERS level 0 in the ENVISAT format (.E1/.E2: main and specific product headers, data
// set descriptors, one data set record per line), ALOS PALSAR level 1.0 CEOS (a leader and one
// image file per polarisation).
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <vector>

#include "qorv_native_archive.h"

/// Outside files an archive may need: the ASAR instrument file (ASA_INS_AX) and an orbit file.
/// Empty: not given (an ASAR reader then looks beside the product for one by its content).
struct CNativeOutsideFiles {
    std::filesystem::path mInstrument;
    std::filesystem::path mOrbit;
};

/// Recognises theInput by its content (a CEOS product directory, its data or its leader file, or
/// an ENVISAT-format file; the names do not matter) and reads its headers. Throws CImportFailure:
/// 261122 when theInput does not exist, 979201 for anything that is not one of the formats (with
/// the words of what it seems to be) and for an ALOS input of several image files (name one, or
/// read them all with fqorvReadNativeArchives), 979202 for a CEOS data file without an ERS
/// leader beside it or an ALOS image file without an ALOS leader, 979203 for record lengths that
/// contradict the file descriptor, 979204 for a record layout of no known facility, 979206 for
/// state vectors whose times go backwards, 979210 for a missing or impossible value.
/// theOutside: the outside files given (an ASAR product needs its instrument file and a DORIS
/// orbit: 979212 when one is neither given nor found beside it, 979213 for a file of another kind
/// or size).
CNativeArchive fqorvReadNativeArchive(const std::filesystem::path& theInput, const CNativeOutsideFiles& theOutside = {});

/// Every product theInput holds: one for an ERS or ENVISAT-format input or an ALOS image file;
/// one per image file (polarisation), in the order HH, HV, VH, VV, for an ALOS leader or product
/// directory. Failures as fqorvReadNativeArchive.
std::vector<CNativeArchive> fqorvReadNativeArchives(const std::filesystem::path& theInput,
                                                    const CNativeOutsideFiles& theOutside = {});

/// The line records of an archive's data file, opened read-only.
class CNativeRecordFile {
public:
    /// Opens the layout's data file; CImportFailure 261122 when it can't be opened.
    explicit CNativeRecordFile(const CNativeRecordLayout& theLayout);
    ~CNativeRecordFile();
    CNativeRecordFile(const CNativeRecordFile&) = delete;
    CNativeRecordFile& operator=(const CNativeRecordFile&) = delete;

    /// The codes of every whole record, walking record by record by each one's own length field:
    /// a length that differs from the layout's is CImportFailure 979203 with the record's index.
    /// theProgress, when given, receives the percentage done.
    std::vector<CRecordCodes> scan(const std::function<void(int)>& theProgress = {});

    /// Reads theCount whole records from record theFirst into theBuffer (theCount times the record
    /// length); CImportFailure 261125 on a read failure.
    void read(uint64_t theFirst, std::size_t theCount, uint8_t* theBuffer);

    /// Reads theCount whole records from record theFirst straight into lines of theStride bytes:
    /// byte b of record k lands at theLines + k theStride + theShift + b; bytes that fall outside
    /// their line are dropped. The samples are copied once, from the page cache into the lines.
    /// CImportFailure 261125 on a read failure.
    void readIntoLines(uint64_t theFirst, std::size_t theCount, uint8_t* theLines, std::size_t theStride, long theShift);

    /// Reads theCount bytes at theOffset of the data file (an ASAR packet by its offset and length
    /// from the scan); CImportFailure 261125 on a read failure.
    void readBytes(uint64_t theOffset, std::size_t theCount, uint8_t* theBuffer);

    const CNativeRecordLayout& layout() const { return mLayout; }

private:
    CNativeRecordLayout mLayout;
    int mFd = -1;
    std::vector<uint8_t> mDropped;   // where readIntoLines puts the bytes outside the lines
};
