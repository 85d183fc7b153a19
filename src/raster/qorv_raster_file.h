// The flat raster file: one fixed-length record per image line, read and written by every step.
//
// File layout: mHeaderLen opaque bytes, then NrOfLinesPerImage records, then mFooterLen opaque
// bytes. A record is mRowPrefix opaque bytes, the line's pixels in the file's byte order, and
// mRowSuffix opaque bytes. Nothing in the file describes it: the caller fills a CRasterFileParam
// (usually with fqorvRasterParamFromHeader). Offsets are 64-bit, files may exceed 2 GB.
// Line numbers and columns count from 0; column ranges are inclusive.
#pragma once

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "qorv_cell_types.h"

class CDescriptionHeader;

// States of a raster file (mRasterStatus).
inline constexpr int CQORV_RF_CLOSE = 0;
inline constexpr int CQORV_RF_OPEN_READ = 1;
inline constexpr int CQORV_RF_OPEN_WRITE = 2;
inline constexpr int CQORV_RF_OPEN_READ_WRITE = 3;
inline constexpr int CQORV_RF_OPEN_TIFF_READ = 4;
inline constexpr int CQORV_RF_OPEN_TIFF_WRITE = 5;

/// Bound of the number of lines and of the number of pixels of a raster.
inline constexpr int CQORV_RASTER_FILE_MAX_ROWS = 900000;
/// Longest record (prefix, line and suffix) in bytes: 64 MiB, four times the widest line of 16-byte cells.
inline constexpr long long CQORV_RASTER_MAX_RECORD_BYTES = 1LL << 26;
/// Byte position from which only the descriptor seek may move the stream.
inline constexpr int64_t CQORV_RF_SEEK_THRESHOLD = 2000000000;

/// What the caller knows about a raster; handed to every open.
struct CRasterFileParam {
    std::string mFileName;             // path; an empty name is refused
    int32_t mNrOfLinesPerImage = 0;    // 1 .. CQORV_RASTER_FILE_MAX_ROWS
    int32_t mNrOfPixelsPerLine = 0;    // 1 .. CQORV_RASTER_FILE_MAX_ROWS
    int mCellType = -1;                // QorvCellType code
    int mDataUnits = -1;               // QorvDataUnits code, -1 when unknown
    int32_t mHeaderLen = 0;            // bytes before record 0
    int32_t mRowPrefix = 0;            // bytes before the pixels of a record
    int32_t mRowSuffix = 0;            // bytes behind the pixels of a record
    int32_t mFooterLen = 0;            // bytes behind the last record (recorded only)
    double mDummyVal = 0.0;            // value that marks an empty cell
    bool mByteOrderMSBF = false;       // false: the file is little-endian (LSBF); true: big-endian
    double mRealScaleFactor = 1.0;     // scale of the real component on typed reads
    double mImaginaryScaleFactor = 1.0;
    bool mLinesTimeDecrease = false;   // lines time direction: false "INCREASE", true "DECREASE"
    bool mPixelsTimeDecrease = false;  // pixels time direction
};

/// Fills a CRasterFileParam from a header holding "RasterInfo" (and "InitialGeometry" for the
/// time directions): sizes, cell type, units, offsets, null value, byte order (unset: the setting
/// QORVEX_DEFAULT_BYTE_ORDER), scale factors (unset: 1.0). Unset plain fields fail as the store does.
void fqorvRasterParamFromHeader(const CDescriptionHeader& theHeader, const char* theFileName,
                                CRasterFileParam& theParam);

class CRasterFile;
/// Writes the TIFF header information of a raster in TIFF write status at its close (the
/// "_hdr" companion); registered by the TIFF export.
using QorvTiffHeaderWriter = void (*)(CRasterFile& theFile);
/// Registers the TIFF header writer; returns the previous one.
QorvTiffHeaderWriter fqorvSetTiffHeaderWriter(QorvTiffHeaderWriter theWriter);

/// A raster file. Every failure goes through QORV_FATAL with the ids 261121 (geometry, mode),
/// 261122 (cannot open for reading), 261124 (write, write seek) and 261125 (read, read seek).
class CRasterFile {
public:
    CRasterFile() = default;
    /// A file left open is closed, with a warning on the trace.
    ~CRasterFile();
    CRasterFile(const CRasterFile&) = delete;
    CRasterFile& operator=(const CRasterFile&) = delete;

    /// Opens for reading (status CQORV_RF_OPEN_READ), positioned at line 0.
    void openRead(const CRasterFileParam& theParam);
    /// Opens for writing: CQORV_RF_OPEN_WRITE creates or empties the file, CQORV_RF_OPEN_READ_WRITE
    /// updates it (created empty when missing). Positioned at line 0, behind the header gap.
    void openWrite(int theMode, const CRasterFileParam& theParam);
    /// Opens a TIFF (CQORV_RF_OPEN_TIFF_READ or CQORV_RF_OPEN_TIFF_WRITE) through libtiff; the
    /// parameter gives the geometry. Line access goes through tiffHandle().
    void openTiff(int theMode, const CRasterFileParam& theParam);
    /// Finishes the file and returns to CQORV_RF_CLOSE. In write status lines above the highest
    /// line reached are completed with zero records (warning 261121), unless the file met a failure.
    /// theKeepHeader: TIFF write status only, writes the TIFF header information first.
    void close(bool theKeepHeader = false);

    /// Reads theRowNbr lines of columns theColStart..theColEnd into theBuffer, native byte order.
    /// Rows and columns outside the image are reported and clamped. Without prefix and suffix and
    /// with theColStart 0, whole records are delivered (line stride = whole line) even when
    /// theColEnd is short; otherwise lines are packed by the column count. A short read is 261125.
    void readLines(int theRowStart, int theRowNbr, int theColStart, int theColEnd, void* theBuffer,
                   bool theVerbose = false);
    /// Writes theRowNbr lines from theBuffer to columns theColStart..theColEnd (theColEnd below 1:
    /// the last pixel). The buffer is left in the file's byte order.
    void writeLines(int theRowStart, int theRowNbr, void* theBuffer, int theColStart = 0,
                    int theColEnd = -1, bool theVerbose = false);
    /// Positions the stream at the first byte of a record; false on a failed seek.
    bool seekLinePosition(int theLine);
    /// Moves the stream by a signed 64-bit byte distance from where it stands; false on failure.
    bool seekRelative(int64_t theDistance);

    /// Read status: a window of theCapacity lines kept in memory (reloaded in the lines time
    /// direction). Write status: a queue of theCapacity lines written out when full.
    void setLineCache(int theCapacity);
    /// Native pixels of a line from column theColStart (whole lines are cached; theColEnd negative:
    /// the last pixel). The pointer stays good until the next line access.
    const uint8_t* getLine(int theLine, int theColStart = 0, int theColEnd = -1);
    /// The one-line pixel buffer (NrOfPixelsPerLine cells, native order), allocated on first need.
    uint8_t* pixelBuffer();
    /// Writes the line held in pixelBuffer() as line theLine, through the write queue when set.
    void putLine(int theLine);
    /// Writes out a write queue and frees the cache.
    void freeLineCache();

    /// Raw bytes of the row prefix of a line, as in the file (no swap).
    void readRowPrefix(int theLine, void* theBuffer);
    /// The prefix bytes (as in the file) of the last record read by readLines when the records
    /// have a prefix: a line and its prefix in one read, without seeking back. Null otherwise.
    const uint8_t* lastRecordPrefix() const { return mRowPrefix > 0 && !mWorkBuffer.empty() ? mWorkBuffer.data() : nullptr; }
    /// Sets the prefix bytes that the following per-line writes carry (mRowPrefix bytes).
    void setRowPrefix(const void* theBytes);

    /// Writes every field to the trace.
    void print() const;

    int getStatus() const { return mRasterStatus; }
    const std::string& getFileName() const { return mFileName; }
    int getNrOfLines() const { return NrOfLinesPerImage; }
    int getNrOfPixels() const { return NrOfPixelsPerLine; }
    int getCellType() const { return mCellType; }
    int getDataUnits() const { return mDataUnits; }
    int getBytesPerPixel() const { return mBytesPerPixel; }
    int getDataNbr() const { return mDataNbr; }
    int getRecordLen() const { return mRecordLen; }
    int getHeaderLen() const { return mHeaderLen; }
    int getRowPrefix() const { return mRowPrefix; }
    int getRowSuffix() const { return mRowSuffix; }
    int getFooterLen() const { return mFooterLen; }
    int getLinePosition() const { return mLinePosition; }
    int getMaxLineWritten() const { return mMaxLineWritten; }
    int getMaxLineSeek() const { return mMaxLineSeek; }
    bool isSwapped() const { return mSwap; }
    bool hasScaleFactor() const { return mScaleFactor; }
    double getDummyVal() const { return mDummyVal; }
    double getRealScaleFactor() const { return mRealScaleFactor; }
    double getImaginaryScaleFactor() const { return mImaginaryScaleFactor; }
    bool isLinesTimeDecrease() const { return mLinesTimeDecrease; }
    bool isPixelsTimeDecrease() const { return mPixelsTimeDecrease; }
    bool isLongSeek() const { return mLongSeek; }
    /// Bytes of the pixels of one whole line (packed for "BIT").
    int getLineBytes() const;
    /// True once a read, write or seek of this file has failed since its open.
    bool hasFailed() const { return mFailed; }

    /// TIFF states: the libtiff handle (TIFF*), and the GeoTIFF handle (GTIF*) set by the export.
    void* tiffHandle() const { return mTiff; }
    void* geoTiffHandle() const { return mGeoTiff; }
    void setGeoTiffHandle(void* theGeoTiff) { mGeoTiff = theGeoTiff; }

private:
    void openCommon(int theMode, const CRasterFileParam& theParam, const char* theModeWords);
    void openStream(int theMode);
    void takeGeometry(const CRasterFileParam& theParam);
    void releaseAll();
    void completeNullLines();
    void closeAfterFailure();
    [[noreturn]] void failRead(int theRowStart, int theRowNbr);
    [[noreturn]] void failWrite(int theLine);
    [[noreturn]] void failSeek(int theRowStart, bool theRead);
    bool seekAbsolute(int64_t theTarget, bool theOrdinary);
    void prepareTransfer(bool theWrite);
    void refuseTransfer(bool theWrite, int theRowNbr);
    void clampRows(int& theRowStart, int theRowNbr, const char* theFirstWords);
    void swapPixels(uint8_t* theData, std::size_t theBytes) const;
    void writeQueue();
    void reloadWindow(int theLine);
    int64_t recordOffset(int theLine) const;

    // Declared in the order of the raster file's state.
    std::string mFileName;
    std::vector<uint8_t> mWorkBuffer;          // one record, allocated at open
    std::vector<uint8_t> mPixelBuffer;         // one line of pixels, allocated on first need
    std::vector<uint8_t> mCacheBlock;          // line cache: capacity lines in one block
    std::vector<int> mCacheLines;              // line number of each slot (write queue)
    int mCacheCapacity = 0;
    int mCacheHeld = 0;
    int mCacheFirst = -1;                      // first and last line of the read window
    int mCacheLast = -1;
    FILE* mStream = nullptr;
    std::vector<char> mStreamBuffer;           // the stream's buffer, released after fclose
    int mRasterStatus = CQORV_RF_CLOSE;
    int NrOfPixelsPerLine = 0;
    int NrOfLinesPerImage = 0;
    int mCellType = -1;
    int mDataUnits = -1;
    void* mTiff = nullptr;
    void* mGeoTiff = nullptr;
    int mHeaderLen = 0;
    int mBytesPerPixel = 0;
    int mRecordLen = 0;
    int mRowPrefix = 0;
    int mRowSuffix = 0;
    int mFooterLen = 0;
    bool mSwap = false;
    int mDataNbr = 0;
    int mLinePosition = 0;
    int mMaxLineSeek = 0;
    int mMaxLineWritten = 0;
    double mDummyVal = 0.0;
    double mRealScaleFactor = 1.0;
    double mImaginaryScaleFactor = 1.0;
    bool mScaleFactor = false;
    bool mLinesTimeDecrease = false;
    bool mPixelsTimeDecrease = false;
    bool mLongSeek = false;
    // Stream direction bookkeeping and the failure mark.
    int mLastTransfer = 0;                     // 0 none, 1 read, 2 write since the last seek
    bool mFailed = false;
};

/// True when the machine stores numbers most significant byte first.
bool fqorvMachineIsMSBF();
