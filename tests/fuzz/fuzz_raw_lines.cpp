// The typed line access of raw rasters: a raster file of one of the raw cell types, opened from a
// header whose raster values come from the input, read line by line as float complex (as the
// steps read their input), through the line cache, and by row prefix. Every access either fails
// through QORV_FATAL or delivers the values the file holds at the record's place; anything else
// (a crash, a sanitizer finding, a value from elsewhere, data from beyond the file) is a fault.
//
// Input: 28 bytes of raster values, little-endian, then the file's bytes (kept in memory):
//   0 u8 flags: bits 0..1 the cell type (UBYTE_COMPLEX, BYTE_COMPLEX, SHORT_COMPLEX,
//     FLOAT_COMPLEX), bit 2 MSBF, bit 3 lines in decreasing time, bit 4 pixels in decreasing time
//   1 u8 line cache capacity (0: none) · 2 u16 a row to read besides the first lines and the last
//   4 s32 lines · 8 s32 pixels · 12 s32 row prefix · 16 s32 row suffix · 20 s32 header offset
//   24 s16, 26 s16 first and last column of a partial read (negative last: to the line's end)
//
// With QORVEX_FUZZ_SEEDS naming a directory, the start-up writes the seeds there: small rasters of
// each cell type with the prefixes of the importers' raw products, a suffix, a header, short files.
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "fuzz_support.h"
#include "qorv_description_section.h"
#include "qorv_errors.h"
#include "qorv_raster_file.h"
#include "tools_raster_file_exp.h"

namespace {

namespace fs = std::filesystem;
using qfuzz::fault;
using Bytes = std::vector<uint8_t>;

constexpr std::size_t PARAMS = 28;
constexpr int SEQUENTIAL_LINES = 16;   // lines read one after the other from the first
constexpr int64_t CACHE_BYTES = 16 << 20;
constexpr int64_t MAX_FUZZED_RECORD = 1 << 20;
constexpr const char* CELL_TYPES[] = {"UBYTE_COMPLEX", "BYTE_COMPLEX", "SHORT_COMPLEX", "FLOAT_COMPLEX"};

template <typename T>
T little(const uint8_t* theBytes)
{
    std::make_unsigned_t<T> v = 0;
    for (std::size_t i = 0; i < sizeof(T); ++i) v |= static_cast<std::make_unsigned_t<T>>(theBytes[i]) << (8 * i);
    return static_cast<T>(v);
}

struct CRawParams {
    int mType = 0;
    bool mMsbf = false, mLinesDecrease = false, mPixelsDecrease = false;
    int mCache = 0, mRow = 0;
    int32_t mLines = 0, mPixels = 0, mPrefix = 0, mSuffix = 0, mHeader = 0;
    int mColStart = 0, mColEnd = -1;

    static CRawParams parse(const uint8_t* d)
    {
        CRawParams p;
        p.mType = d[0] & 3;
        p.mMsbf = (d[0] & 4) != 0;
        p.mLinesDecrease = (d[0] & 8) != 0;
        p.mPixelsDecrease = (d[0] & 16) != 0;
        p.mCache = d[1];
        p.mRow = little<uint16_t>(d + 2);
        p.mLines = little<int32_t>(d + 4);
        p.mPixels = little<int32_t>(d + 8);
        p.mPrefix = little<int32_t>(d + 12);
        p.mSuffix = little<int32_t>(d + 16);
        p.mHeader = little<int32_t>(d + 20);
        p.mColStart = little<int16_t>(d + 24);
        p.mColEnd = little<int16_t>(d + 26);
        return p;
    }

    Bytes bytes() const
    {
        Bytes b(PARAMS);
        b[0] = static_cast<uint8_t>(mType | (mMsbf ? 4 : 0) | (mLinesDecrease ? 8 : 0) | (mPixelsDecrease ? 16 : 0));
        b[1] = static_cast<uint8_t>(mCache);
        const auto put = [&](std::size_t at, uint32_t v, int n) {
            for (int i = 0; i < n; ++i) b[at + i] = static_cast<uint8_t>(v >> (8 * i));
        };
        put(2, static_cast<uint32_t>(mRow), 2);
        put(4, static_cast<uint32_t>(mLines), 4);
        put(8, static_cast<uint32_t>(mPixels), 4);
        put(12, static_cast<uint32_t>(mPrefix), 4);
        put(16, static_cast<uint32_t>(mSuffix), 4);
        put(20, static_cast<uint32_t>(mHeader), 4);
        put(24, static_cast<uint32_t>(mColStart), 2);
        put(26, static_cast<uint32_t>(mColEnd), 2);
        return b;
    }
};

// ------------------------------------------------------------------------------------------------
// The file in memory and its header

/// The raster's bytes in an anonymous memory file, opened by the raster file through its /proc name.
class CMemoryFile {
public:
    CMemoryFile() : mFd(::memfd_create("qorvex-raw-lines", MFD_CLOEXEC))
    {
        if (mFd < 0) fault("memfd_create failed");
        mName = "/proc/self/fd/" + std::to_string(mFd);
    }
    void fill(const uint8_t* theBytes, std::size_t theCount)
    {
        if (::ftruncate(mFd, 0) != 0 || (theCount > 0 && ::pwrite(mFd, theBytes, theCount, 0) != static_cast<ssize_t>(theCount)))
            fault("can't fill the memory file");
    }
    const std::string& name() const { return mName; }

private:
    int mFd;
    std::string mName;
};

/// The header of a raw product as far as its raster goes.
CDescriptionHeader& rawHeader(const CRawParams& p)
{
    static const std::unique_ptr<CDescriptionHeader> aHeader(new CDescriptionHeader({"RasterInfo", "InitialGeometry"}));
    CDescriptionHeader& h = *aHeader;
    h["RasterInfo.NrOfLinesPerImage"].setValue(p.mLines);
    h["RasterInfo.NrOfPixelsPerLine"].setValue(p.mPixels);
    h["RasterInfo.CellType"].setValue(CELL_TYPES[p.mType]);
    h["RasterInfo.DataUnits"].setValue("ERS_RAW");
    h["RasterInfo.BytesOrder"].setValue(p.mMsbf ? "MSBF" : "LSBF");
    h["RasterInfo.HeaderOffset"].setValue(p.mHeader);
    h["RasterInfo.RowPrefix"].setValue(p.mPrefix);
    h["RasterInfo.RowSuffix"].setValue(p.mSuffix);
    h["RasterInfo.NullCellValue"].setValue(0.0);
    h["InitialGeometry.TimeDirectionLines"].setValue(p.mLinesDecrease ? "DECREASE TIME DIRECTION" : "INCREASE TIME DIRECTION");
    h["InitialGeometry.TimeDirectionPixel"].setValue(p.mPixelsDecrease ? "DECREASE TIME DIRECTION" : "INCREASE TIME DIRECTION");
    return h;
}

// ------------------------------------------------------------------------------------------------
// What a read must deliver

/// The file's bytes and how its records lie, to tell what a line of the raster holds.
struct CExpected {
    const uint8_t* mFile;
    std::size_t mSize;
    const CRawParams& mParams;
    int64_t mRecord;

    int fileRow(int theRow) const { return mParams.mLinesDecrease ? mParams.mLines - 1 - theRow : theRow; }
    int64_t recordStart(int theFileRow) const { return int64_t{mParams.mHeader} + theFileRow * mRecord; }

    /// A delivered record must lie wholly in the file.
    void checkInFile(int theFileRow, const char* theWhat) const
    {
        if (recordStart(theFileRow) + mRecord > static_cast<int64_t>(mSize))
            fault(std::string(theWhat) + ": line " + std::to_string(theFileRow) + " delivered from beyond the file's " +
                  std::to_string(mSize) + " bytes");
    }

    fcomplex cell(int theFileRow, int theColumn) const
    {
        static constexpr int aPart[] = {1, 1, 2, 4};
        const int n = aPart[mParams.mType];
        const uint8_t* c = mFile + recordStart(theFileRow) + mParams.mPrefix + int64_t{theColumn} * 2 * n;
        const auto part = [&](const uint8_t* x) -> float {
            uint8_t b[4];
            for (int i = 0; i < n; ++i) b[i] = mParams.mMsbf ? x[n - 1 - i] : x[i];
            switch (mParams.mType) {
            case 0: return b[0];
            case 1: return static_cast<int8_t>(b[0]);
            case 2: return little<int16_t>(b);
            default: {
                const uint32_t aBits = little<uint32_t>(b);
                float f;
                std::memcpy(&f, &aBits, sizeof f);
                return f;
            }
            }
        };
        return {part(c), part(c + n)};
    }

    /// theBuffer holds columns theFirst .. theFirst + theCount - 1 of row theRow, in the raster's
    /// time directions.
    void checkLine(int theRow, int theFirst, int theCount, const fcomplex* theBuffer, const char* theWhat) const
    {
        const int r = fileRow(theRow);
        checkInFile(r, theWhat);
        const auto same = [](float a, float b) { return a == b || (std::isnan(a) && std::isnan(b)); };
        for (int k = 0; k < theCount; ++k) {
            const int aColumn = mParams.mPixelsDecrease ? mParams.mPixels - 1 - (theFirst + k) : theFirst + k;
            const fcomplex e = cell(r, aColumn);
            if (!same(e.real(), theBuffer[k].real()) || !same(e.imag(), theBuffer[k].imag()))
                fault(std::string(theWhat) + ": row " + std::to_string(theRow) + " index " + std::to_string(k) + " reads (" +
                      std::to_string(theBuffer[k].real()) + ", " + std::to_string(theBuffer[k].imag()) + "), the file holds (" +
                      std::to_string(e.real()) + ", " + std::to_string(e.imag()) + ")");
        }
    }

    void checkPrefix(int theFileRow, const uint8_t* thePrefix, const char* theWhat) const
    {
        checkInFile(theFileRow, theWhat);
        if (std::memcmp(thePrefix, mFile + recordStart(theFileRow), static_cast<std::size_t>(mParams.mPrefix)) != 0)
            fault(std::string(theWhat) + ": the prefix of line " + std::to_string(theFileRow) + " differs from the file's");
    }
};

// ------------------------------------------------------------------------------------------------
// The reads

std::vector<fcomplex> gLine;
Bytes gPrefix;

/// A typed read of row theRow, columns theStart .. theEnd, checked when it succeeds; true then.
bool readTyped(CRasterFile& f, const CExpected& e, int theRow, int theStart, int theEnd, const char* theWhat)
{
    bool aRead = false;
    QFUZZ_CLEAN_FAILURES((fqorvReadLine(f, gLine.data(), theRow, theStart, theEnd), aRead = true));
    if (!aRead) return false;
    const int aEnd = theEnd < 0 ? e.mParams.mPixels - 1 : theEnd;
    e.checkLine(theRow, theStart, aEnd - theStart + 1, gLine.data(), theWhat);
    return true;
}

/// The steps' roads: lines one after the other, with the prefix of the record just read; a row
/// of the input, a partial line and rows beyond the image; the row prefixes alone; the same rows
/// again through the line cache.
void readAll(CRasterFile& f, const CExpected& e)
{
    const CRawParams& p = e.mParams;
    gLine.resize(static_cast<std::size_t>(p.mPixels));
    gPrefix.resize(static_cast<std::size_t>(p.mPrefix));
    const int aLines = p.mLines;
    for (int r = 0; r < std::min(aLines, SEQUENTIAL_LINES); ++r) {
        if (!readTyped(f, e, r, 0, -1, "sequential read")) break;
        if (const uint8_t* aPrefix = f.lastRecordPrefix()) e.checkPrefix(e.fileRow(r), aPrefix, "prefix of the last record");
    }
    const int aRows[] = {p.mRow, aLines - 1, p.mRow % aLines, aLines, -1 - p.mRow};
    for (const int r : aRows) readTyped(f, e, r, 0, -1, "read of a row");
    readTyped(f, e, p.mRow % aLines, p.mColStart, p.mColEnd, "partial read");

    if (p.mPrefix > 0) {
        for (const int r : {0, p.mRow, aLines - 1}) {
            bool aRead = false;
            QFUZZ_CLEAN_FAILURES((f.readRowPrefix(r, gPrefix.data()), aRead = true));
            // Rows outside the image are taken as the nearest line.
            if (aRead) e.checkPrefix(std::clamp(r, 0, aLines - 1), gPrefix.data(), "row prefix");
        }
    }

    if (p.mCache > 0) {
        // As a step sizes its cache: lines within a memory budget. A window never reaches beyond
        // the image, and one of a record more than the file holds reaches beyond the file from
        // wherever it starts, as any longer one does: a larger cache would read and fail alike,
        // and only cost its memory (up to the budget, zeroed, on every execution).
        const int64_t aBudget = std::max<int64_t>(1, CACHE_BYTES / f.getLineBytes());
        const int64_t aInFile = std::max<int64_t>(0, static_cast<int64_t>(e.mSize) - p.mHeader) / e.mRecord + 1;
        const int aCapacity = static_cast<int>(std::min<int64_t>({p.mCache, aBudget, std::max(aLines, 1), aInFile}));
        QFUZZ_CLEAN_FAILURES(f.setLineCache(aCapacity));
        for (const int r : {0, p.mRow % aLines, aLines - 1, 1}) readTyped(f, e, r, 0, -1, "read through the cache");
        readTyped(f, e, p.mRow % aLines, p.mColStart, p.mColEnd, "partial read through the cache");
    }
}

CMemoryFile* gFile = nullptr;

// ------------------------------------------------------------------------------------------------
// Seeds

void writeSeeds(const char* theDir)
{
    if (theDir == nullptr || *theDir == '\0') return;
    const fs::path aDir(theDir);
    fs::create_directories(aDir);
    struct CSeed {
        const char* mName;
        CRawParams mParams;
        double mRecordsInFile;   // records the file holds (a fraction: it ends inside one)
    };
    const auto params = [](int theType, bool theMsbf, int theLines, int thePixels, int thePrefix, int theSuffix, int theHeader,
                           int theCache, bool theDecrease) {
        CRawParams p;
        p.mType = theType;
        p.mMsbf = theMsbf;
        p.mLines = theLines;
        p.mPixels = thePixels;
        p.mPrefix = thePrefix;
        p.mSuffix = theSuffix;
        p.mHeader = theHeader;
        p.mCache = theCache;
        p.mLinesDecrease = p.mPixelsDecrease = theDecrease;
        p.mRow = 5;
        p.mColStart = 3;
        p.mColEnd = 20;
        return p;
    };
    const CSeed aSeeds[] = {
        {"seed-ers-ubyte", params(0, true, 40, 64, 412, 0, 0, 0, false), 40},
        {"seed-envisat-byte", params(1, true, 40, 64, 266, 0, 0, 8, false), 40},
        {"seed-short-suffix-header", params(2, false, 24, 48, 64, 16, 720, 4, false), 24},
        {"seed-float-decreasing", params(3, false, 16, 32, 0, 0, 0, 5, true), 16},
        {"seed-float-msbf-short-file", params(3, true, 32, 40, 120, 8, 100, 0, false), 20.5},
        {"seed-ubyte-plain", params(0, false, 64, 100, 0, 0, 0, 16, false), 64},
    };
    for (const CSeed& s : aSeeds) {
        const CRawParams& p = s.mParams;
        const int64_t aRecord = int64_t{p.mPixels} * 2 * (p.mType == 2 ? 2 : p.mType == 3 ? 4 : 1) + p.mPrefix + p.mSuffix;
        Bytes aSeed = p.bytes();
        const auto aSize = static_cast<std::size_t>(p.mHeader + s.mRecordsInFile * static_cast<double>(aRecord));
        for (std::size_t i = 0; i < aSize; ++i) aSeed.push_back(static_cast<uint8_t>(i * 7 + i / 251));
        std::ofstream(aDir / s.mName, std::ios::binary).write(reinterpret_cast<const char*>(aSeed.data()), static_cast<std::streamsize>(aSeed.size()));
    }
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    qfuzz::setUpRun();
    gFile = new CMemoryFile;
    writeSeeds(std::getenv("QORVEX_FUZZ_SEEDS"));
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    if (theSize < PARAMS) return 0;
    const CRawParams p = CRawParams::parse(theData);
    // Records the raster takes but longer than a MiB cost milliseconds of buffers per execution
    // and are left out; the bound the raster sets (and sums beyond any int) stay in.
    static constexpr int aCellBytes[] = {2, 2, 4, 8};
    const int64_t aRecord = int64_t{p.mPixels} * aCellBytes[p.mType] + p.mPrefix + p.mSuffix;
    if (aRecord > MAX_FUZZED_RECORD && aRecord <= CQORV_RASTER_MAX_RECORD_BYTES && p.mPixels > 0 && p.mPrefix >= 0 && p.mSuffix >= 0)
        return 0;
    const uint8_t* aBytes = theData + PARAMS;
    const std::size_t n = theSize - PARAMS;
    gFile->fill(aBytes, n);

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(rawHeader(p), gFile->name().c_str(), aParam);
    CRasterFile f;
    bool aOpen = false;
    QFUZZ_CLEAN_FAILURES((f.openRead(aParam), aOpen = true));
    if (!aOpen) return 0;
    // An open file has sizes within the raster's bounds: the harness's buffers follow them.
    const CExpected e{aBytes, n, p, aRecord};
    if (f.getRecordLen() != e.mRecord) fault("records of " + std::to_string(f.getRecordLen()) + " bytes, not " + std::to_string(e.mRecord));
    readAll(f, e);
    QFUZZ_CLEAN_FAILURES(f.close());
    return 0;
}
