// The headers of every ENVISAT-format product the import reads (ERS and ASAR level 0, the ASAR
// instrument file, the DORIS orbit file): a main product header (MPH) of 1247 bytes, then a
// specific product header (SPH) of SPH_SIZE bytes whose last NUM_DSD x DSD_SIZE bytes are the data
// set descriptors (DSDs), then the data sets.
//
// The headers are lines of KEY=value: texts in double quotes, numbers with a sign and their unit
// in angle brackets (X_POSITION=-0001234567.890<m>). They are read by key, not by offset.
// Private to src/import.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

#include "qorv_date.h"
#include "qorv_native_archive.h"

inline constexpr std::size_t CQORV_ENVISAT_MPH_BYTES = 1247;

/// The KEY=value lines of one header block. A key asked for and absent, or a value that is not
/// what is asked for, fails with 979210 and the block's name.
class CEnvisatKeyValues {
public:
    CEnvisatKeyValues() = default;
    CEnvisatKeyValues(const std::vector<uint8_t>& theBytes, std::size_t theBegin, std::size_t theEnd, std::string theName);

    bool has(const std::string& theKey) const { return mValues.count(theKey) != 0; }
    const std::string& name() const { return mName; }

    /// The text between the quotes without its padding, or the number without its unit.
    std::string text(const std::string& theKey) const;
    double number(const std::string& theKey) const;
    /// An integer up to 2^53 (counts, sizes and offsets).
    int64_t integer(const std::string& theKey) const;
    /// A date "DD-MMM-YYYY hh:mm:ss.uuuuuu" in UTC.
    CQorvDate date(const std::string& theKey) const;
    /// The date as seconds from the midnight of theReferenceDay (days since 1970-01-01).
    double time(const std::string& theKey, long theReferenceDay) const;

private:
    std::map<std::string, std::string> mValues;
    std::string mName;
};

/// The main and specific product headers of one file.
struct CEnvisatHeaders {
    std::string mFile;               // the file's name, for failures
    std::vector<uint8_t> mBytes;     // MPH and SPH, the DSDs included
    CEnvisatKeyValues mMph, mSph;
    std::size_t mSphSize = 0;

    /// Byte of the file where the headers end and the first data set usually begins.
    uint64_t headersEnd() const { return CQORV_ENVISAT_MPH_BYTES + mSphSize; }
    /// Every data set descriptor; 979210 when their count and size do not fit the SPH.
    std::vector<CEnvisatKeyValues> descriptors() const;
    /// The data set descriptor whose DS_NAME is theName; 979210 when there is none.
    CEnvisatKeyValues descriptor(const std::string& theName) const;
};

/// Reads the MPH and SPH of theFile. 261122 when it can't be opened, 979210 for an SPH_SIZE that
/// is none or beyond 16 MB.
CEnvisatHeaders fqorvReadEnvisatHeaders(const std::filesystem::path& theFile);

/// The PRODUCT of an ENVISAT-format file ("ASA_IM__0PNPDE2004..."), "" when theFile does not begin
/// with a PRODUCT line or can't be read.
std::string fqorvEnvisatProductName(const std::filesystem::path& theFile);

/// The polarisation of TX_RX_POLAR ("V/V": "VV"); theDefault when the SPH states none.
std::string fqorvEnvisatPolarisation(const CEnvisatKeyValues& theSph, const std::string& theDefault);

/// PROC_CENTER, SOFTWARE_VER and ABS_ORBIT of the MPH into the archive's identity.
void fqorvReadEnvisatIdentity(const CEnvisatKeyValues& theMph, CNativeArchive& theArchive);

/// The MPH's one state vector (STATE_VECTOR_TIME, X/Y/Z_POSITION, X/Y/Z_VELOCITY), its time from
/// the midnight of theReferenceDay.
CStateVector fqorvEnvisatStateVector(const CEnvisatKeyValues& theMph, long theReferenceDay);
