// The flat raster file: open, seek, read, write, line cache and close.
#include "qorv_raster_file.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <exception>
#include <new>

#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

#include <tiffio.h>
#include <geotiff.h>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"

static_assert(sizeof(off_t) == 8, "raster files need 64-bit file offsets");

namespace {

QorvTiffHeaderWriter gTiffHeaderWriter = nullptr;

// The stdio buffer of a raster stream. A transfer at least as long as the buffer goes straight
// between the caller's memory and the file, so records of 32 KiB or more get a buffer of exactly
// one record (at most 1 MiB): whole-line reads and writes then cost one system call and no copy,
// and the kernel's read-ahead keeps sequential reads at the disk's speed. Shorter records (raw
// echoes with their prefixes) share a buffer of whole records of about 1 MiB.
constexpr std::size_t CQORV_RF_STREAM_BUFFER = 1u << 20;
constexpr std::size_t CQORV_RF_DIRECT_RECORD = 32u << 10;

// A file only read never fills more of the buffer than it holds: a small one (a quick-look, a
// short raw product) gets a buffer of its whole records, at least one.
std::size_t streamBufferSize(int theRecordLen, FILE* theStream, bool theReadOnly)
{
    const std::size_t aRecord = static_cast<std::size_t>(theRecordLen);
    std::size_t aSize = aRecord >= CQORV_RF_DIRECT_RECORD ? std::min(aRecord, CQORV_RF_STREAM_BUFFER)
                                                         : (CQORV_RF_STREAM_BUFFER / aRecord) * aRecord;
    struct stat aStat;
    if (theReadOnly && fstat(fileno(theStream), &aStat) == 0 && S_ISREG(aStat.st_mode)) {
        const std::size_t aFile = static_cast<std::size_t>(std::max<off_t>(aStat.st_size, 1));
        aSize = std::min(aSize, (aFile + aRecord - 1) / aRecord * aRecord);
    }
    return aSize;
}

const char* statusHeading(int theStatus)
{
    switch (theStatus) {
    case CQORV_RF_CLOSE: return "- RASTER FILE CLOSE **********************\n\n";
    case CQORV_RF_OPEN_READ: return "- RASTER FILE IN READ MODE **********************";
    case CQORV_RF_OPEN_WRITE: return "- RASTER FILE IN WRITE MODE **********************";
    case CQORV_RF_OPEN_READ_WRITE: return "- RASTER FILE IN READ AND WRITE MODE **********************";
    case CQORV_RF_OPEN_TIFF_READ: return "- RASTER TIFF FILE IN READ MODE **********************";
    case CQORV_RF_OPEN_TIFF_WRITE: return "- RASTER TIFF FILE IN WRITE  MODE **********************";
    default: return "- RASTER FILE IN UNKNOWN MODE **********************";
    }
}

// Traces a failure's words and reports it; never returns.
[[noreturn]] void failWith(int theId, const std::string& theWords)
{
    fdfTrace("%s", theWords.c_str());
    QORV_FATAL(theId, theWords.c_str());
}

// Buffers of the stream work: an allocation that fails is an exception in raster input or output (913921).
void allocateBytes(std::vector<uint8_t>& theBuffer, std::size_t theBytes)
{
    try {
        theBuffer.assign(theBytes, 0);
    } catch (const std::exception&) {
        fdfTrace("ERROR  %s   %s    FILE=%s   LINE=%d  ERRNO = %d", fdfGetTitle(), gVersionText.c_str(),
                 __FILE__, __LINE__, errno);
        QORV_FATAL(CQORV_ERR_RASTER_EXCEPTION, "raster buffer allocation");
    }
}

bool isWriteStatus(int theStatus)
{
    return theStatus == CQORV_RF_OPEN_WRITE || theStatus == CQORV_RF_OPEN_READ_WRITE;
}

}  // namespace

bool fqorvMachineIsMSBF()
{
    const uint16_t aProbe = 1;
    uint8_t aFirst;
    std::memcpy(&aFirst, &aProbe, 1);
    return aFirst == 0;
}

QorvTiffHeaderWriter fqorvSetTiffHeaderWriter(QorvTiffHeaderWriter theWriter)
{
    QorvTiffHeaderWriter aOld = gTiffHeaderWriter;
    gTiffHeaderWriter = theWriter;
    return aOld;
}

// ------------------------------------------------------------------------------------------------
// Open and close

CRasterFile::~CRasterFile()
{
    if (mRasterStatus == CQORV_RF_CLOSE) return;
    fdfTrace("Warning: the raster file %s has not been closed: closing it\n", mFileName.c_str());
    // Destroyed while a failure unwinds the stack: the file is not finished as a good one.
    if (std::uncaught_exceptions() > 0) mFailed = true;
    try {
        close(false);
    } catch (...) {
        // The failure was reported on its road before it was thrown; only release the file here.
        mFailed = true;
        closeAfterFailure();
    }
}

void CRasterFile::openRead(const CRasterFileParam& theParam)
{
    openCommon(CQORV_RF_OPEN_READ, theParam, "input");
}

void CRasterFile::openWrite(int theMode, const CRasterFileParam& theParam)
{
    if (theMode != CQORV_RF_OPEN_WRITE && theMode != CQORV_RF_OPEN_READ_WRITE)
        failWith(CQORV_ERR_RASTER_ACCESS, fqorvStringFormat("Error: wrong open mode %d for the raster file %s\n",
                                                            theMode, theParam.mFileName.c_str()));
    openCommon(theMode, theParam, "input");  // the same words for every open mode
}

void CRasterFile::openCommon(int theMode, const CRasterFileParam& theParam, const char* theModeWords)
{
    if (mRasterStatus != CQORV_RF_CLOSE)
        failWith(CQORV_ERR_RASTER_ACCESS,
                 fqorvStringFormat("Error: attempting to open the raster file %s in %s mode while it was not closed\n",
                                   theParam.mFileName.c_str(), theModeWords));
    if (theParam.mFileName.empty())
        failWith(CQORV_ERR_RASTER_ACCESS, "You have to set the file name in CRasterFileParam \n");

    mFileName = theParam.mFileName;
    mLongSeek = false;
    mFailed = false;
    // The geometry is checked before the stream opens, so that a refused open creates no file.
    takeGeometry(theParam);
    openStream(theMode);
    mRasterStatus = theMode;

    // Record 0 stands behind the header: every mode starts positioned there, so that line 0 is the
    // current line and the header is a gap that writes never touch.
    if (mHeaderLen > 0 && fseeko(mStream, static_cast<off_t>(mHeaderLen), SEEK_SET) != 0) {
        mFailed = true;
        failSeek(0, theMode == CQORV_RF_OPEN_READ);
    }
    mLastTransfer = 0;
}

void CRasterFile::takeGeometry(const CRasterFileParam& theParam)
{
    if (theParam.mNrOfLinesPerImage < 1 || theParam.mNrOfLinesPerImage > CQORV_RASTER_FILE_MAX_ROWS)
        failWith(CQORV_ERR_RASTER_ACCESS, fqorvStringFormat("mNrOfLinesPerImage = %d\nCQORV_RASTER_FILE_MAX_ROWS = %d\n",
                                                            theParam.mNrOfLinesPerImage, CQORV_RASTER_FILE_MAX_ROWS));
    if (theParam.mNrOfPixelsPerLine < 1 || theParam.mNrOfPixelsPerLine > CQORV_RASTER_FILE_MAX_ROWS)
        failWith(CQORV_ERR_RASTER_ACCESS, fqorvStringFormat("mNrOfPixelsPerLine = %d\nCQORV_RASTER_FILE_MAX_ROWS = %d\n",
                                                            theParam.mNrOfPixelsPerLine, CQORV_RASTER_FILE_MAX_ROWS));
    if (theParam.mHeaderLen < 0 || theParam.mRowPrefix < 0 || theParam.mRowSuffix < 0 || theParam.mFooterLen < 0)
        failWith(CQORV_ERR_RASTER_ACCESS,
                 fqorvStringFormat("mHeaderLen = %d\nmRowPrefix = %d\nmRowSuffix = %d\nmFooterLen = %d\n",
                                   theParam.mHeaderLen, theParam.mRowPrefix, theParam.mRowSuffix, theParam.mFooterLen));

    int aBytesPerPixel = 0;
    int aDataNbr = 0;
    fqorvCellTypeSize(theParam.mCellType, aBytesPerPixel, aDataNbr);
    if (aBytesPerPixel <= 0)
        failWith(CQORV_ERR_RASTER_READ, fqorvStringFormat("mDataNbr = %d\nmBytesPerPixel = %d\ntheCellType = %d\n",
                                                          aDataNbr, aBytesPerPixel, theParam.mCellType));

    mBytesPerPixel = aBytesPerPixel;
    mDataNbr = aDataNbr;
    NrOfLinesPerImage = theParam.mNrOfLinesPerImage;
    NrOfPixelsPerLine = theParam.mNrOfPixelsPerLine;
    mCellType = theParam.mCellType;
    mDataUnits = theParam.mDataUnits;
    mHeaderLen = theParam.mHeaderLen;
    mRowPrefix = theParam.mRowPrefix;
    mRowSuffix = theParam.mRowSuffix;
    mFooterLen = theParam.mFooterLen;
    mDummyVal = theParam.mDummyVal;
    mMaxLineWritten = 0;
    mLinePosition = 0;

    mSwap = theParam.mByteOrderMSBF != fqorvMachineIsMSBF();
    // A record (prefix, line, suffix) and the header stay well inside what an int and the memory of
    // one line buffer hold; sums of hostile sizes are checked in 64 bits before they are used.
    const int64_t aLineBytes = mCellType == CQORV_CELL_BIT ? (static_cast<int64_t>(NrOfPixelsPerLine) + 7) / 8 * mBytesPerPixel
                                                            : static_cast<int64_t>(NrOfPixelsPerLine) * mBytesPerPixel;
    const int64_t aRecordLen = aLineBytes + mRowPrefix + mRowSuffix;
    if (aRecordLen > CQORV_RASTER_MAX_RECORD_BYTES || aRecordLen <= 0)
        failWith(CQORV_ERR_RASTER_ACCESS,
                 fqorvStringFormat("record of %lld bytes (prefix %d, line %lld, suffix %d) is over the limit of %lld\n",
                                   static_cast<long long>(aRecordLen), mRowPrefix, static_cast<long long>(aLineBytes),
                                   mRowSuffix, static_cast<long long>(CQORV_RASTER_MAX_RECORD_BYTES)));
    mRecordLen = static_cast<int>(aRecordLen);
    allocateBytes(mWorkBuffer, static_cast<std::size_t>(mRecordLen));
    mMaxLineSeek = static_cast<int>(CQORV_RF_SEEK_THRESHOLD / mRecordLen);
    mRealScaleFactor = theParam.mRealScaleFactor;
    mImaginaryScaleFactor = theParam.mImaginaryScaleFactor;
    mScaleFactor = !(std::isfinite(mRealScaleFactor) && std::isfinite(mImaginaryScaleFactor) &&
                     mRealScaleFactor == 1.0 && mImaginaryScaleFactor == 1.0);
    if (mBytesPerPixel / mDataNbr < 2) mSwap = false;  // one-byte components never swap
    mLinesTimeDecrease = theParam.mLinesTimeDecrease;
    mPixelsTimeDecrease = theParam.mPixelsTimeDecrease;
}

void CRasterFile::openStream(int theMode)
{
    const char* aName = mFileName.c_str();
    const char* aMode = "rb";
    if (theMode == CQORV_RF_OPEN_READ_WRITE) {
        struct stat aStat;
        if (stat(aName, &aStat) != 0) {
            FILE* aNew = std::fopen(aName, "wb");
            if (aNew != nullptr) std::fclose(aNew);
        }
        // Clear a read-only attribute: the owner may write.
        if (stat(aName, &aStat) == 0 && (aStat.st_mode & S_IWUSR) == 0) chmod(aName, aStat.st_mode | S_IWUSR);
        aMode = "rb+";
    } else if (theMode == CQORV_RF_OPEN_WRITE) {
        aMode = "wb";
    }
    errno = 0;
    mStream = std::fopen(aName, aMode);
    if (mStream == nullptr) {
        const int aErrno = errno;
        failWith(theMode == CQORV_RF_OPEN_READ ? CQORV_ERR_MISSING_FILE : CQORV_ERR_RASTER_ACCESS,
                 fqorvStringFormat("Error: cannot open the file: %s  errno = %d\n", aName, aErrno));
    }
    mStreamBuffer.assign(streamBufferSize(mRecordLen, mStream, theMode == CQORV_RF_OPEN_READ), 0);
    setvbuf(mStream, mStreamBuffer.data(), _IOFBF, mStreamBuffer.size());
}

void CRasterFile::openTiff(int theMode, const CRasterFileParam& theParam)
{
    if (mRasterStatus != CQORV_RF_CLOSE)
        failWith(CQORV_ERR_RASTER_ACCESS,
                 fqorvStringFormat("Error: attempting to open the raster file %s in %s mode while it was not closed\n",
                                   theParam.mFileName.c_str(), "input"));
    if (theParam.mFileName.empty())
        failWith(CQORV_ERR_RASTER_ACCESS, "You have to set the file name in CRasterFileParam \n");
    if (theMode != CQORV_RF_OPEN_TIFF_READ && theMode != CQORV_RF_OPEN_TIFF_WRITE)
        failWith(CQORV_ERR_RASTER_ACCESS, fqorvStringFormat("Error: wrong open mode %d for the raster file %s\n",
                                                            theMode, theParam.mFileName.c_str()));
    mFileName = theParam.mFileName;
    mLongSeek = false;
    mFailed = false;
    takeGeometry(theParam);
    errno = 0;
    mTiff = TIFFOpen(mFileName.c_str(), theMode == CQORV_RF_OPEN_TIFF_READ ? "r" : "w");
    if (mTiff == nullptr) {
        const int aErrno = errno;
        failWith(theMode == CQORV_RF_OPEN_TIFF_READ ? CQORV_ERR_MISSING_FILE : CQORV_ERR_RASTER_ACCESS,
                 fqorvStringFormat("Error: cannot open the file: %s  errno = %d\n", mFileName.c_str(), aErrno));
    }
    mRasterStatus = theMode;
}

void CRasterFile::close(bool theKeepHeader)
{
    if (mRasterStatus == CQORV_RF_CLOSE)
        failWith(CQORV_ERR_RASTER_ACCESS,
                 fqorvStringFormat("Error: attempting to close a raster file %s while it was not open\n",
                                   mFileName.empty() ? "no file name" : mFileName.c_str()));
    if (mFailed) {
        closeAfterFailure();
        return;
    }
    if (mCacheCapacity > 0) freeLineCache();

    switch (mRasterStatus) {
    case CQORV_RF_OPEN_WRITE:
        completeNullLines();
        [[fallthrough]];
    case CQORV_RF_OPEN_READ_WRITE:
        // The last buffered bytes are part of the file: a failing flush is a failing write.
        if (std::fflush(mStream) != 0) {
            mFailed = true;
            failWrite(mMaxLineWritten);
        }
        [[fallthrough]];
    case CQORV_RF_OPEN_READ:
        std::fclose(mStream);
        mStream = nullptr;
        break;
    case CQORV_RF_OPEN_TIFF_WRITE:
        if (theKeepHeader && gTiffHeaderWriter != nullptr) gTiffHeaderWriter(*this);
        [[fallthrough]];
    case CQORV_RF_OPEN_TIFF_READ:
        if (mGeoTiff != nullptr) GTIFFree(static_cast<GTIF*>(mGeoTiff));
        if (mTiff != nullptr) TIFFClose(static_cast<TIFF*>(mTiff));
        mGeoTiff = nullptr;
        mTiff = nullptr;
        break;
    default:
        break;
    }
    releaseAll();
}

void CRasterFile::completeNullLines()
{
    if (mMaxLineWritten >= NrOfLinesPerImage) return;
    std::string aWords = fqorvStringFormat("WARNING NULL line writed :%d in file :%s", mMaxLineWritten, mFileName.c_str());
    QORV_WARNING(CQORV_ERR_RASTER_ACCESS, aWords.c_str());
    // The filler is zero bytes everywhere, prefix and suffix included.
    std::fill(mWorkBuffer.begin(), mWorkBuffer.end(), 0);
    std::vector<uint8_t> aZeroLine;
    allocateBytes(aZeroLine, static_cast<std::size_t>(getLineBytes()));
    while (mMaxLineWritten < NrOfLinesPerImage) {
        std::fill(aZeroLine.begin(), aZeroLine.end(), 0);
        writeLines(mMaxLineWritten, 1, aZeroLine.data(), 0, -1, false);
    }
}

// A file that met a failure is closed without being finished: no queued line is written and no
// null line is added. A file created by this open keeps only the whole records below its highest
// line reached, and its ENVI header is removed, so that nothing claims lines the file does not
// hold: readers of the short file fail with 261125. Never raises.
void CRasterFile::closeAfterFailure()
{
    if (mStream != nullptr) {
        std::fflush(mStream);
        if (mRasterStatus == CQORV_RF_OPEN_WRITE) {
            struct stat aStat;
            const int aFd = fileno(mStream);
            if (fstat(aFd, &aStat) == 0 && S_ISREG(aStat.st_mode)) {
                const int64_t aKeep = recordOffset(mMaxLineWritten);
                if (aStat.st_size > aKeep && ftruncate(aFd, static_cast<off_t>(aKeep)) != 0)
                    fdfTrace("Warning: cannot cut the raster file %s after a failure  errno = %d\n", mFileName.c_str(), errno);
            }
            const std::string aEnvi = mFileName + ".hdr";
            if (std::remove(aEnvi.c_str()) == 0)
                fdfTrace("Raster file %s closed after a failure: %s removed\n", mFileName.c_str(), aEnvi.c_str());
        }
        std::fclose(mStream);
        mStream = nullptr;
    }
    if (mGeoTiff != nullptr) GTIFFree(static_cast<GTIF*>(mGeoTiff));
    if (mTiff != nullptr) TIFFClose(static_cast<TIFF*>(mTiff));
    mGeoTiff = nullptr;
    mTiff = nullptr;
    releaseAll();
}

void CRasterFile::releaseAll()
{
    mRasterStatus = CQORV_RF_CLOSE;
    mLinePosition = 0;
    mMaxLineWritten = 0;
    mLastTransfer = 0;
    mFileName.clear();
    mWorkBuffer = {};
    mPixelBuffer = {};
    mCacheBlock = {};
    mCacheLines = {};
    mCacheCapacity = 0;
    mCacheHeld = 0;
    mCacheFirst = -1;
    mCacheLast = -1;
    mStreamBuffer = {};
}

// ------------------------------------------------------------------------------------------------
// Seeks

int64_t CRasterFile::recordOffset(int theLine) const
{
    return static_cast<int64_t>(mRecordLen) * theLine + mHeaderLen;
}

int CRasterFile::getLineBytes() const
{
    if (mCellType == CQORV_CELL_BIT) return ((NrOfPixelsPerLine + 7) / 8) * mBytesPerPixel;
    return NrOfPixelsPerLine * mBytesPerPixel;
}

// The two roads to an absolute position. The ordinary road is a plain stream seek; the descriptor
// road flushes the stream's buffer first and then moves the file position with a 64-bit offset
// through the stream, so that the stream and its descriptor always agree.
bool CRasterFile::seekAbsolute(int64_t theTarget, bool theOrdinary)
{
    if (theOrdinary) {
        if (fseeko(mStream, static_cast<off_t>(theTarget), SEEK_SET) != 0) {
            fdfTrace("FAIL seek AP : %lld\n", static_cast<long long>(theTarget));
            return false;
        }
        return true;
    }
    std::fflush(mStream);
    errno = 0;
    if (fseeko(mStream, static_cast<off_t>(theTarget), SEEK_SET) != 0) {
        const int aErrno = errno;
        fdfTrace("ERROR : _lseeki64 errno = %d\nFILE : %s\nmLinePosition : %d\noffset : %lld\nthis_pos : %lld\n", aErrno,
                 mFileName.c_str(), mLinePosition, static_cast<long long>(theTarget),
                 static_cast<long long>(ftello(mStream)));
        return false;
    }
    return true;
}

bool CRasterFile::seekLinePosition(int theLine)
{
    if (theLine == mLinePosition) {
        if (mMaxLineWritten < mLinePosition) mMaxLineWritten = mLinePosition;
        return true;
    }
    const int64_t aTarget = recordOffset(theLine);
    if (isWriteStatus(mRasterStatus)) std::fflush(mStream);
    const int64_t aCurrent = ftello(mStream);
    bool aOk;
    if (!mLongSeek && aCurrent < CQORV_RF_SEEK_THRESHOLD && aTarget < CQORV_RF_SEEK_THRESHOLD) {
        mLongSeek = true;
        aOk = seekAbsolute(aTarget, true);
    } else {
        aOk = seekAbsolute(aTarget, false);
    }
    mLastTransfer = 0;
    if (!aOk) {
        mLinePosition = -1;  // position unknown: the next access seeks again
        return false;
    }
    mLinePosition = theLine;
    return true;
}

bool CRasterFile::seekRelative(int64_t theDistance)
{
    if (theDistance == 0) return true;
    if (isWriteStatus(mRasterStatus)) std::fflush(mStream);
    const int64_t aCurrent = ftello(mStream);
    bool aOk;
    if (!mLongSeek && aCurrent < CQORV_RF_SEEK_THRESHOLD && aCurrent + theDistance < CQORV_RF_SEEK_THRESHOLD) {
        aOk = seekAbsolute(aCurrent + theDistance, true);
    } else {
        mLongSeek = true;
        aOk = seekAbsolute(aCurrent + theDistance, false);
    }
    mLastTransfer = 0;
    return aOk;
}

// A stream that changes between reading and writing must be repositioned in between.
void CRasterFile::prepareTransfer(bool theWrite)
{
    const int aTransfer = theWrite ? 2 : 1;
    if (mLastTransfer != 0 && mLastTransfer != aTransfer) fseeko(mStream, 0, SEEK_CUR);
    mLastTransfer = aTransfer;
}

// ------------------------------------------------------------------------------------------------
// Failures of transfers

void CRasterFile::failRead(int theRowStart, int theRowNbr)
{
    mFailed = true;
    const long long aPos = ftello(mStream);
    mLinePosition = -1;
    fdfTrace("Read file  ERROR : STATUS %d   CQORV_RF_CLOSE %d\ntheRowNbr : %d\nthis_pos : %lld\nthis_pos K : %lld\n"
             "(mRecordLen * theRowNbr) %lld\n",
             mRasterStatus, CQORV_RF_CLOSE, theRowNbr, aPos % 1000, aPos / 1000,
             static_cast<long long>(mRecordLen) * theRowNbr);
    QORV_FATAL(CQORV_ERR_RASTER_READ,
               fqorvStringFormat("Read file  ERROR : %s line %d", mFileName.c_str(), theRowStart).c_str());
}

void CRasterFile::failWrite(int theLine)
{
    const int aErrno = errno;
    mFailed = true;
    mLinePosition = -1;
    failWith(CQORV_ERR_WRITE_FILE, fqorvStringFormat("Error: impossible to write record %d  on file %s  errno = %d\n",
                                                     theLine, mFileName.c_str(), aErrno));
}

void CRasterFile::failSeek(int theRowStart, bool theRead)
{
    mFailed = true;
    failWith(theRead ? CQORV_ERR_RASTER_READ : CQORV_ERR_WRITE_FILE,
             fqorvStringFormat("ERROR LOOP BEFORE seekLinePosition  : %s theRowStart = %d\n", mFileName.c_str(),
                               theRowStart));
}

// ------------------------------------------------------------------------------------------------
// Lines

void CRasterFile::clampRows(int& theRowStart, int theRowNbr, const char* theFirstWords)
{
    if (theRowStart < 0 || theRowStart >= NrOfLinesPerImage) {
        fdfTrace("%s %d is outside the image!\n", theFirstWords, theRowStart);
        theRowStart = theRowStart < 1 ? 0 : NrOfLinesPerImage - 1;
    }
    const int64_t aLast = static_cast<int64_t>(theRowStart) + theRowNbr - 1;
    if (aLast >= NrOfLinesPerImage)
        fdfTrace("%s %lld is outside the image!\n", theFirstWords, static_cast<long long>(aLast));
}

/// Reverses the bytes of each group of sizeof(W) bytes in place.
template <typename W, typename Swap>
void reverseGroups(uint8_t* theData, std::size_t theBytes, Swap theSwap)
{
    for (std::size_t i = 0; i + sizeof(W) <= theBytes; i += sizeof(W)) {
        W v;
        std::memcpy(&v, theData + i, sizeof(W));
        v = theSwap(v);
        std::memcpy(theData + i, &v, sizeof(W));
    }
}

void CRasterFile::swapPixels(uint8_t* theData, std::size_t theBytes) const
{
    const int aGroup = mBytesPerPixel / mDataNbr;
    switch (aGroup) {
    case 2:
        for (std::size_t i = 0; i + 1 < theBytes; i += 2) std::swap(theData[i], theData[i + 1]);
        break;
    case 4:
        reverseGroups<uint32_t>(theData, theBytes, [](uint32_t v) { return __builtin_bswap32(v); });
        break;
    case 8:
        reverseGroups<uint64_t>(theData, theBytes, [](uint64_t v) { return __builtin_bswap64(v); });
        break;
    default:
        break;
    }
}

/// Refuses a read (261125) or a write (261124) of a file that is closed, open in the other
/// direction, or asked for no lines.
void CRasterFile::refuseTransfer(bool theWrite, int theRowNbr)
{
    const int aId = theWrite ? CQORV_ERR_WRITE_FILE : CQORV_ERR_RASTER_READ;
    const char* aVerb = theWrite ? "write to" : "read from";
    const bool aClosed = mRasterStatus == CQORV_RF_CLOSE ||
                         mRasterStatus == (theWrite ? CQORV_RF_OPEN_TIFF_WRITE : CQORV_RF_OPEN_TIFF_READ);
    const bool aOtherDirection = theWrite
                                     ? (mRasterStatus == CQORV_RF_OPEN_READ || mRasterStatus == CQORV_RF_OPEN_TIFF_READ)
                                     : (mRasterStatus == CQORV_RF_OPEN_WRITE || mRasterStatus == CQORV_RF_OPEN_TIFF_WRITE);
    if (aClosed)
        failWith(aId, fqorvStringFormat("Error: attempting to %s the raster file %s while it was not open\n", aVerb,
                                        mFileName.c_str()));
    if (aOtherDirection)
        failWith(aId, fqorvStringFormat("Error: attempting to %s the raster file %s while it was open in %s mode\n", aVerb,
                                        mFileName.c_str(), theWrite ? "read" : "write"));
    if (theRowNbr < 1)
        failWith(aId, fqorvStringFormat("Error: attempting to %s the raster file %s a negative or null number of lines\n",
                                        aVerb, mFileName.c_str()));
}

void CRasterFile::readLines(int theRowStart, int theRowNbr, int theColStart, int theColEnd, void* theBuffer,
                            bool theVerbose)
{
    refuseTransfer(false, theRowNbr);
    if (mCellType == CQORV_CELL_BIT) {
        theColStart = 0;
        theColEnd = NrOfPixelsPerLine - 1;
    }
    clampRows(theRowStart, theRowNbr, "Requested line");
    if (theColStart < 0 || theColStart >= NrOfPixelsPerLine) {
        fdfTrace("Requested column %d is outside the image!\n", theColStart);
        theColStart = theColStart < 1 ? 0 : NrOfPixelsPerLine - 1;
    }
    if (theColEnd < theColStart || theColEnd >= NrOfPixelsPerLine) {
        fdfTrace("Requested column %d is outside the image!\n", theColEnd);
        theColEnd = theColEnd < theColStart ? theColStart : NrOfPixelsPerLine - 1;
    }
    if (theVerbose) fdfTrace(mSwap ? "Swap DATA\n" : "Normal DATA\n");

    const int aInRecordStart = mBytesPerPixel * theColStart + mRowPrefix;
    const int aLineLength =
        mCellType == CQORV_CELL_BIT ? getLineBytes() : mBytesPerPixel * (theColEnd - theColStart + 1);
    uint8_t* aOut = static_cast<uint8_t*>(theBuffer);

    if (aInRecordStart + mRowSuffix == 0) {
        // Whole records in one transfer, straight into the caller's buffer.
        if (!seekLinePosition(theRowStart)) failSeek(theRowStart, true);
        prepareTransfer(false);
        const std::size_t aBytes = static_cast<std::size_t>(mRecordLen) * theRowNbr;
        if (std::fread(aOut, 1, aBytes, mStream) != aBytes) failRead(theRowStart, theRowNbr);
        if (mSwap) swapPixels(aOut, aBytes);
        mLinePosition += theRowNbr;
    } else {
        for (int i = 0; i < theRowNbr; ++i) {
            if (!seekLinePosition(theRowStart + i)) failSeek(theRowStart + i, true);
            prepareTransfer(false);
            if (std::fread(mWorkBuffer.data(), 1, mRecordLen, mStream) != static_cast<std::size_t>(mRecordLen))
                failRead(theRowStart + i, 1);
            std::memcpy(aOut, mWorkBuffer.data() + aInRecordStart, aLineLength);
            if (mSwap) swapPixels(aOut, aLineLength);
            aOut += aLineLength;
            ++mLinePosition;
        }
    }
    if (mMaxLineWritten < mLinePosition) mMaxLineWritten = mLinePosition;
}

void CRasterFile::writeLines(int theRowStart, int theRowNbr, void* theBuffer, int theColStart, int theColEnd,
                             bool theVerbose)
{
    refuseTransfer(true, theRowNbr);
    clampRows(theRowStart, theRowNbr, "Request to write line");
    if (theColEnd < 1 || theColEnd >= NrOfPixelsPerLine) theColEnd = NrOfPixelsPerLine - 1;
    if (theColStart < 0 || theColStart > theColEnd) {
        fdfTrace("Request to write column %d outside the image!\n", theColStart);
        theColStart = theColStart < 1 ? 0 : theColEnd;
    }
    if (mCellType == CQORV_CELL_BIT) {
        theColStart = 0;
        theColEnd = NrOfPixelsPerLine - 1;
    }
    if (theVerbose) fdfTrace(mSwap ? "Swap DATA\n" : "Normal DATA\n");

    if (!seekLinePosition(theRowStart)) failSeek(theRowStart, false);
    prepareTransfer(true);
    uint8_t* aIn = static_cast<uint8_t*>(theBuffer);
    const bool aWholeLine = theColStart == 0 && theColEnd == NrOfPixelsPerLine - 1;

    if (mRowPrefix != 0 || mRowSuffix != 0 || !aWholeLine) {
        const int aLineLength =
            mCellType == CQORV_CELL_BIT ? getLineBytes() : mBytesPerPixel * (theColEnd - theColStart + 1);
        const int aInRecordStart = mRowPrefix + theColStart * mBytesPerPixel;
        for (int i = 0; i < theRowNbr; ++i, aIn += aLineLength) {
            if (mSwap) swapPixels(aIn, aLineLength);
            if (mRasterStatus == CQORV_RF_OPEN_WRITE) {
                std::memcpy(mWorkBuffer.data() + aInRecordStart, aIn, aLineLength);
                if (std::fwrite(mWorkBuffer.data(), 1, mRecordLen, mStream) != static_cast<std::size_t>(mRecordLen))
                    failWrite(theRowStart + i);
            } else {
                if (!seekRelative(aInRecordStart)) failSeek(theRowStart + i, false);
                prepareTransfer(true);
                if (std::fwrite(aIn, 1, aLineLength, mStream) != static_cast<std::size_t>(aLineLength) ||
                    std::fflush(mStream) != 0)
                    failWrite(theRowStart + i);
                if (!seekRelative(mRecordLen - aInRecordStart - aLineLength)) failSeek(theRowStart + i, false);
                prepareTransfer(true);
            }
        }
    } else {
        const std::size_t aBytes = static_cast<std::size_t>(mRecordLen) * theRowNbr;
        if (mSwap) swapPixels(aIn, aBytes);
        if (std::fwrite(aIn, 1, aBytes, mStream) != aBytes) failWrite(theRowStart);
        if (mRasterStatus == CQORV_RF_OPEN_READ_WRITE && std::fflush(mStream) != 0) failWrite(theRowStart);
    }
    mLinePosition += theRowNbr;
    if (mMaxLineWritten < mLinePosition) mMaxLineWritten = mLinePosition;
}

void CRasterFile::readRowPrefix(int theLine, void* theBuffer)
{
    if (mRasterStatus != CQORV_RF_OPEN_READ && mRasterStatus != CQORV_RF_OPEN_READ_WRITE)
        failWith(CQORV_ERR_RASTER_READ, fqorvStringFormat("Error: attempting to read from the raster file %s while it was not open\n",
                                                          mFileName.c_str()));
    if (mRowPrefix == 0) return;
    int aLine = theLine;
    clampRows(aLine, 1, "Requested line");
    if (!seekLinePosition(aLine)) failSeek(aLine, true);
    prepareTransfer(false);
    if (std::fread(mWorkBuffer.data(), 1, mRecordLen, mStream) != static_cast<std::size_t>(mRecordLen))
        failRead(aLine, 1);
    std::memcpy(theBuffer, mWorkBuffer.data(), mRowPrefix);
    ++mLinePosition;
    if (mMaxLineWritten < mLinePosition) mMaxLineWritten = mLinePosition;
}

void CRasterFile::setRowPrefix(const void* theBytes)
{
    if (mRowPrefix > 0 && !mWorkBuffer.empty()) std::memcpy(mWorkBuffer.data(), theBytes, mRowPrefix);
}

// ------------------------------------------------------------------------------------------------
// Line cache

uint8_t* CRasterFile::pixelBuffer()
{
    if (mPixelBuffer.empty()) allocateBytes(mPixelBuffer, static_cast<std::size_t>(getLineBytes()));
    return mPixelBuffer.data();
}

void CRasterFile::setLineCache(int theCapacity)
{
    if (mCacheCapacity > 0) freeLineCache();
    if (theCapacity < 1 || mRasterStatus == CQORV_RF_CLOSE) return;
    allocateBytes(mCacheBlock, static_cast<std::size_t>(getLineBytes()) * theCapacity);
    mCacheLines.assign(theCapacity, -1);
    mCacheCapacity = theCapacity;
    mCacheHeld = 0;
    mCacheFirst = -1;
    mCacheLast = -1;
}

void CRasterFile::reloadWindow(int theLine)
{
    int aFirst, aLast;
    if (mLinesTimeDecrease) {
        aFirst = std::max(theLine - mCacheCapacity + 1, 0);
        aLast = theLine;
    } else {
        aFirst = theLine;
        aLast = std::min(theLine + mCacheCapacity - 1, NrOfLinesPerImage - 1);
    }
    mCacheHeld = 0;  // a failing reload leaves no window behind
    readLines(aFirst, aLast - aFirst + 1, 0, NrOfPixelsPerLine - 1, mCacheBlock.data(), false);
    mCacheFirst = aFirst;
    mCacheLast = aLast;
    mCacheHeld = aLast - aFirst + 1;
}

const uint8_t* CRasterFile::getLine(int theLine, int theColStart, int theColEnd)
{
    const bool aInImage = theLine >= 0 && theLine < NrOfLinesPerImage;
    if (mCellType == CQORV_CELL_BIT) theColStart = 0;
    if (mCacheCapacity > 0 && mRasterStatus != CQORV_RF_OPEN_WRITE && aInImage && theColStart >= 0 &&
        theColStart < NrOfPixelsPerLine) {
        if (mCacheHeld == 0 || theLine < mCacheFirst || theLine > mCacheLast) reloadWindow(theLine);
        return mCacheBlock.data() + static_cast<std::size_t>(theLine - mCacheFirst) * getLineBytes() +
               static_cast<std::size_t>(theColStart) * mBytesPerPixel;
    }
    if (theColEnd < 0) theColEnd = NrOfPixelsPerLine - 1;
    uint8_t* aBuffer = pixelBuffer();
    readLines(theLine, 1, theColStart, theColEnd, aBuffer, false);
    return aBuffer;
}

void CRasterFile::putLine(int theLine)
{
    uint8_t* aPixels = pixelBuffer();
    if (mCacheCapacity > 0 && mRasterStatus == CQORV_RF_OPEN_WRITE) {
        if (mCacheHeld == mCacheCapacity) writeQueue();
        const std::size_t aLineBytes = static_cast<std::size_t>(getLineBytes());
        std::memcpy(mCacheBlock.data() + aLineBytes * mCacheHeld, aPixels, aLineBytes);
        mCacheLines[mCacheHeld] = theLine;
        ++mCacheHeld;
        return;
    }
    // A read window of a file open for update must not keep the old content of this line.
    if (mCacheCapacity > 0 && mCacheHeld > 0 && theLine >= mCacheFirst && theLine <= mCacheLast) mCacheHeld = 0;
    writeLines(theLine, 1, aPixels, 0, -1, false);
}

// Writes the queued lines in the order they came; runs of consecutive lines go in one transfer.
void CRasterFile::writeQueue()
{
    const std::size_t aLineBytes = static_cast<std::size_t>(getLineBytes());
    int k = 0;
    while (k < mCacheHeld) {
        int aRun = 1;
        while (k + aRun < mCacheHeld && mCacheLines[k + aRun] == mCacheLines[k] + aRun) ++aRun;
        writeLines(mCacheLines[k], aRun, mCacheBlock.data() + aLineBytes * k, 0, -1, false);
        k += aRun;
    }
    mCacheHeld = 0;
}

void CRasterFile::freeLineCache()
{
    if (mCacheCapacity > 0 && mRasterStatus == CQORV_RF_OPEN_WRITE && mCacheHeld > 0) writeQueue();
    mCacheBlock = {};
    mCacheLines = {};
    mCacheCapacity = 0;
    mCacheHeld = 0;
    mCacheFirst = -1;
    mCacheLast = -1;
}

// ------------------------------------------------------------------------------------------------
// Print

void CRasterFile::print() const
{
    fdfTrace("\n%s\n", statusHeading(mRasterStatus));
    fdfTrace("mFileName = %s\n", mFileName.empty() ? "no file name" : mFileName.c_str());
    fdfTrace("mRasterStatus = %d\n", mRasterStatus);
    fdfTrace("NrOfPixelsPerLine = %d\n", NrOfPixelsPerLine);
    fdfTrace("NrOfLinesPerImage = %d\n", NrOfLinesPerImage);
    fdfTrace("mCellType = %d (%s)\n", mCellType, fqorvCellTypeName(mCellType));
    fdfTrace("mDataUnits = %d (%s)\n", mDataUnits, fqorvDataUnitsName(mDataUnits));
    fdfTrace("mHeaderLen = %d\n", mHeaderLen);
    fdfTrace("mBytesPerPixel = %d\n", mBytesPerPixel);
    fdfTrace("mRecordLen = %d\n", mRecordLen);
    fdfTrace("mRowPrefix = %d\n", mRowPrefix);
    fdfTrace("mRowSuffix = %d\n", mRowSuffix);
    fdfTrace("mFooterLen = %d\n", mFooterLen);
    fdfTrace(mSwap ? "Swap DATA\n" : "Normal DATA\n");
    fdfTrace("mDataNbr = %d\n", mDataNbr);
    fdfTrace("mLinePosition = %d\n", mLinePosition);
    fdfTrace("mMaxLineSeek = %d\n", mMaxLineSeek);
    fdfTrace("mMaxLineWritten = %d\n", mMaxLineWritten);
    fdfTrace("mDummyVal = %lf\n", mDummyVal);
    fdfTrace("mRealScaleFactor = %lf\n", mRealScaleFactor);
    fdfTrace("mImaginaryScaleFactor = %lf\n", mImaginaryScaleFactor);
    fdfTrace("mScaleFactor = %d\n", mScaleFactor ? 1 : 0);
    fdfTrace("Lines time direction = %s\n", mLinesTimeDecrease ? "DECREASE" : "INCREASE");
    fdfTrace("Pixels time direction = %s\n", mPixelsTimeDecrease ? "DECREASE" : "INCREASE");
    fdfTrace("Line cache = %d lines, %d held\n", mCacheCapacity, mCacheHeld);
}
