// CEOS records of the simulated archives, shared by the ERS and ALOS writers: the 12-byte record
// header (sequence number u32 @0, four type bytes @4, record length u32 @8), text fields (An text
// left-justified, In/Fn numbers right-justified, blank padded), dates, the head of a file
// descriptor and the platform position record; and files written under a ".part" name.
#pragma once

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <vector>

#include "qorv_state_vectors.h"

namespace NQORV_SIM_CEOS {

inline constexpr int RECORD_HEADER = 12;
inline constexpr int VECTOR_BASE = 386;    // first state vector of the platform position record
inline constexpr int VECTOR_SIZE = 132;    // six F22 fields

using CRecord = std::vector<uint8_t>;

/// A record of theLength bytes: its 12-byte header, the rest blank (CEOS text records) or zero.
CRecord ceosRecord(uint32_t theSequence, const uint8_t (&theTypes)[4], uint32_t theLength, bool theBlank);
/// An field: text left-justified, blank padded; std::runtime_error when it does not fit.
void putA(CRecord& r, int theOffset, int theWidth, const std::string& theText);
/// Right-justified in theWidth characters.
void putRight(CRecord& r, int theOffset, int theWidth, const std::string& theText);
/// In field.
void putI(CRecord& r, int theOffset, int theWidth, long long theValue);
/// Fn field: fixed notation with as many decimals (up to theMaxDecimals) as the width holds; NaN
/// writes theFiller, by default "-9999999.9" (as many nines as fit a narrower field).
void putF(CRecord& r, int theOffset, int theWidth, double theValue, const char* theFiller = nullptr, int theMaxDecimals = 15);

/// Civil date and time of a time in seconds from the midnight of theDay, rounded to theUnit
/// (1e-3: ms, 1e-6: us); the fraction is returned in that unit.
struct CCivilTime {
    int mYear, mMonth, mDay, mHour, mMinute, mSecond;
    long mFraction;
    int mDayOfYear;
    long mDayNumber;     // days since 1970-01-01
    long mSecondOfDay;
};
CCivilTime civilTime(long theDay, double theSeconds, double theUnit);
/// "YYYYMMDDhhmmssttt": the leader's time text, to the millisecond.
std::string ceosTime(long theDay, double theSeconds);

/// A file written from the start, with fields patched in place at the end.
class CPartFile {
public:
    explicit CPartFile(const std::filesystem::path& thePath) : mPath(thePath)
    {
        mFile = std::fopen(thePath.c_str(), "wb");
        if (!mFile) throw std::runtime_error("cannot create " + thePath.string());
        // A small buffer stays in the processor's cache, where the kernel copies it from fast; a
        // buffer of megabytes made the copy into the page cache cost half a second per frame.
        mBuffer.resize(std::size_t{1} << 16);
        std::setvbuf(mFile, mBuffer.data(), _IOFBF, mBuffer.size());
    }
    ~CPartFile()
    {
        if (mFile) std::fclose(mFile);
    }
    CPartFile(const CPartFile&) = delete;
    CPartFile& operator=(const CPartFile&) = delete;

    void append(const uint8_t* theData, std::size_t theSize)
    {
        if (std::fwrite(theData, 1, theSize, mFile) != theSize) fail();
    }
    void append(const CRecord& r) { append(r.data(), r.size()); }
    void append(const std::string& s) { append(reinterpret_cast<const uint8_t*>(s.data()), s.size()); }
    /// Overwrites bytes already written at theOffset.
    void patch(long theOffset, const uint8_t* theData, std::size_t theSize)
    {
        if (std::fflush(mFile) != 0 || fseeko(mFile, theOffset, SEEK_SET) != 0) fail();
        append(theData, theSize);
        if (std::fflush(mFile) != 0 || fseeko(mFile, 0, SEEK_END) != 0) fail();
    }
    void patch(long theOffset, const std::string& s) { patch(theOffset, reinterpret_cast<const uint8_t*>(s.data()), s.size()); }
    void close()
    {
        const int aStatus = std::fclose(mFile);
        mFile = nullptr;
        if (aStatus != 0) fail();
    }

private:
    [[noreturn]] void fail() { throw std::runtime_error("cannot write " + mPath.string()); }
    std::filesystem::path mPath;
    std::FILE* mFile = nullptr;
    std::vector<char> mBuffer;
};

/// Writes theRecords into a new file.
void writeWhole(const std::filesystem::path& thePath, const std::vector<CRecord>& theRecords);
/// "<thePath>.part"
std::filesystem::path partOf(const std::filesystem::path& thePath);

/// The common head of a file descriptor record (types x,192,18,18) naming theFileName.
void putDescriptorHead(CRecord& r, const char* theFileName);

/// A platform position record of the vectors v (at least 2, equally spaced; times in s from the
/// midnight of theReferenceDay), room for at least theMinimum: 140 I4 count · 144/148/152/156 I4
/// year, month, day, day of year of the first vector · 160 F22 its seconds of day · 182 F22
/// interval (s) · 204 A64 "Earth Centred Rotating" · 386 + 132 k: 6 x F22 x, y, z (m), vx, vy,
/// vz (m/s).
CRecord platformPosition(uint32_t theSequence, const uint8_t (&theTypes)[4], long theReferenceDay,
                         const std::vector<CStateVector>& v, std::size_t theMinimum);

}  // namespace NQORV_SIM_CEOS
