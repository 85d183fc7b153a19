// The flat raster file: layouts, byte orders, seeks beyond 2 GB, cache, completion and refusals.
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <functional>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "qorv_errors.h"
#include "qorvex_test_support.h"
#include "raster_test_util.h"
#include "tools_raster_file_exp.h"

using namespace rtest;

namespace {

class RasterFileTest : public ::testing::Test {
protected:
    std::string path(const std::string& theName) const { return mEnv.workPath(theName).string(); }
    int countOf(const std::string& theText) const
    {
        const std::string aTrace = mEnv.trace();
        int n = 0;
        for (std::size_t p = aTrace.find(theText); p != std::string::npos; p = aTrace.find(theText, p + 1)) ++n;
        return n;
    }
    qtest::InProcessEnvironment mEnv;
};

// A pattern of distinct bytes for theCount bytes.
std::vector<uint8_t> pattern(std::size_t theCount, int theSeed = 3)
{
    std::vector<uint8_t> aBytes(theCount);
    for (std::size_t i = 0; i < theCount; ++i) aBytes[i] = static_cast<uint8_t>((i * 7 + theSeed) & 0xff);
    return aBytes;
}

}  // namespace

// The row and column limits are inclusive; one beyond them, or no lines at all, is refused.
TEST_F(RasterFileTest, GeometryBoundsAreInclusive)
{
    const std::string aName = path("bounds");
    writeBytes(aName, {});
    const int aMax = CQORV_RASTER_FILE_MAX_ROWS;
    CRasterFile f;
    f.openRead(param(aName, aMax, aMax, CQORV_CELL_UNSIGNED_BYTE));
    f.close();
    for (auto [aLines, aPixels] : {std::pair{aMax + 1, 1}, std::pair{1, aMax + 1}, std::pair{0, 1}}) {
        mEnv.reinit();
        EXPECT_QORV_FAILURE(f.openRead(param(aName, aLines, aPixels, CQORV_CELL_UNSIGNED_BYTE)), CQORV_ERR_RASTER_ACCESS);
    }
}

// Every cell type in both byte orders: the file holds each component in the asked order, a read
// gives the native values back, and one-byte components never swap.
TEST_F(RasterFileTest, EveryCellTypeInBothByteOrders)
{
    const int aLines = 3, aPixels = 13;
    for (int aType = 0; aType < CQORV_CELL_TYPE_NBR; ++aType) {
        for (bool aMSBF : {false, true}) {
            SCOPED_TRACE(std::string(fqorvCellTypeName(aType)) + (aMSBF ? " MSBF" : " LSBF"));
            const std::string aName = path("cells_" + std::to_string(aType) + (aMSBF ? "_m" : "_l"));
            const CRasterFileParam p = param(aName, aLines, aPixels, aType, aMSBF);
            CRasterFile f;
            f.openWrite(CQORV_RF_OPEN_WRITE, p);
            const int aGroup = f.getBytesPerPixel() / f.getDataNbr();
            const std::vector<uint8_t> aNative = pattern(static_cast<std::size_t>(f.getLineBytes()) * aLines, aType);
            std::vector<uint8_t> aBuffer = aNative;
            f.writeLines(0, aLines, aBuffer.data());
            f.close();
            EXPECT_EQ(fileBytes(aName), aMSBF != fqorvMachineIsMSBF() ? swapped(aNative, aGroup) : aNative);

            f.openRead(p);
            std::vector<uint8_t> aBack(aNative.size());
            f.readLines(0, aLines, 0, aPixels - 1, aBack.data());
            EXPECT_EQ(aBack, aNative);
            f.close();
        }
    }
}

// Reads clamp a start row outside the image to the nearest line; without prefix and suffix a read
// from column 0 delivers whole records even for a short last column, with a prefix it packs.
TEST_F(RasterFileTest, ClampingAndWholeRecordRoad)
{
    const int aLines = 4, aPixels = 6;
    const std::string aName = path("clamp");
    std::vector<float> aAll(aLines * aPixels);
    for (int i = 0; i < aLines * aPixels; ++i) aAll[i] = static_cast<float>(i);
    writeBytes(aName, asBytes(aAll));

    CRasterFile f;
    f.openRead(param(aName, aLines, aPixels, CQORV_CELL_FLOAT));
    std::vector<float> aTwo(2 * aPixels, -1.0f);
    f.readLines(10, 1, 0, aPixels - 1, aTwo.data());
    EXPECT_EQ(aTwo[0], 18.0f);
    f.readLines(-3, 1, 0, aPixels - 1, aTwo.data());
    EXPECT_EQ(aTwo[0], 0.0f);
    f.readLines(0, 2, 0, 2, aTwo.data());
    EXPECT_EQ(aTwo, std::vector<float>(aAll.begin(), aAll.begin() + 2 * aPixels));
    f.close();

    // The same lines behind a prefix: the columns come packed, three per line.
    std::vector<uint8_t> aBytes;
    for (int l = 0; l < aLines; ++l) {
        aBytes.insert(aBytes.end(), {0xAA, 0xBB});
        const std::vector<uint8_t> aRow = asBytes(std::vector<float>(aAll.begin() + l * aPixels, aAll.begin() + (l + 1) * aPixels));
        aBytes.insert(aBytes.end(), aRow.begin(), aRow.end());
    }
    writeBytes(aName, aBytes);
    CRasterFileParam p = param(aName, aLines, aPixels, CQORV_CELL_FLOAT);
    p.mRowPrefix = 2;
    f.openRead(p);
    std::vector<float> aPacked(6, -1.0f);
    f.readLines(1, 2, 1, 3, aPacked.data());
    EXPECT_EQ(aPacked, (std::vector<float>{7, 8, 9, 13, 14, 15}));
    std::vector<uint8_t> aPrefix(2, 0);
    f.readRowPrefix(3, aPrefix.data());
    EXPECT_EQ(aPrefix, (std::vector<uint8_t>{0xAA, 0xBB}));
    f.close();
}

// Header gap, prefix and suffix around big-endian cells, byte for byte; an update in place of two
// columns touches their bytes only, and reading on after it still works.
TEST_F(RasterFileTest, PrefixSuffixAndHeaderGap)
{
    const std::string aName = path("prefixed");
    const int aLines = 3, aPixels = 4, aHeader = 7, aRecord = 3 + aPixels * 2 + 2;
    CRasterFileParam p = param(aName, aLines, aPixels, CQORV_CELL_SHORT, true);
    p.mHeaderLen = aHeader;
    p.mRowPrefix = 3;
    p.mRowSuffix = 2;
    auto aCells = [](int l) { return std::vector<int16_t>{int16_t(l * 100 + 1), int16_t(l * 100 + 2), int16_t(-l - 1), 0x1234}; };

    CRasterFile f;
    f.openWrite(CQORV_RF_OPEN_WRITE, p);
    const uint8_t aTag[3] = {'A', 'B', 'C'};
    f.setRowPrefix(aTag);
    for (int l = 0; l < aLines; ++l) f.writeLines(l, 1, aCells(l).data());
    f.close();
    std::vector<uint8_t> aExpected(aHeader, 0);
    for (int l = 0; l < aLines; ++l) {
        aExpected.insert(aExpected.end(), {'A', 'B', 'C'});
        for (int16_t v : aCells(l)) aExpected.insert(aExpected.end(), {uint8_t(uint16_t(v) >> 8), uint8_t(v & 0xff)});
        aExpected.insert(aExpected.end(), {0, 0});
    }
    EXPECT_EQ(fileBytes(aName), aExpected);

    f.openWrite(CQORV_RF_OPEN_READ_WRITE, p);
    std::vector<int16_t> aTwo = {-7, 77};
    f.writeLines(1, 1, aTwo.data(), 1, 2);
    std::vector<int16_t> aBack(aPixels);
    f.readLines(1, 1, 0, aPixels - 1, aBack.data());
    EXPECT_EQ(aBack, (std::vector<int16_t>{101, -7, 77, 0x1234}));
    f.readLines(2, 1, 0, aPixels - 1, aBack.data());
    EXPECT_EQ(aBack, aCells(2));
    f.close();
    const uint8_t aNew[4] = {0xFF, 0xF9, 0x00, 0x4D};
    std::copy(aNew, aNew + 4, aExpected.begin() + aHeader + aRecord + 3 + 2);  // line 1, columns 1 and 2
    EXPECT_EQ(fileBytes(aName), aExpected);
}

// Lines missing at the tail are written as nulls at close, prefix included; lines skipped in the
// middle are not filled, and a file written to its end is not touched.
TEST_F(RasterFileTest, NullLineCompletionAtClose)
{
    CRasterFileParam p = param(path("nulls"), 5, 3, CQORV_CELL_FLOAT);
    p.mRowPrefix = 2;
    CRasterFile w;
    w.openWrite(CQORV_RF_OPEN_WRITE, p);
    const uint8_t aTag[2] = {9, 9};
    w.setRowPrefix(aTag);
    std::vector<float> aRow = {1, 2, 3};
    w.writeLines(0, 1, aRow.data());
    w.close();
    const std::vector<uint8_t> aFile = fileBytes(p.mFileName);
    const int aRecord = 2 + 3 * 4;
    ASSERT_EQ(aFile.size(), static_cast<std::size_t>(5 * aRecord));
    EXPECT_EQ(aFile[0], 9);
    EXPECT_EQ(std::vector<uint8_t>(aFile.begin() + aRecord, aFile.end()), std::vector<uint8_t>(4 * aRecord, 0));
    EXPECT_EQ(countOf("WARNING NULL line writed :1 in file :"), 1);

    const std::string aHoles = path("holes");
    w.openWrite(CQORV_RF_OPEN_WRITE, param(aHoles, 6, 3, CQORV_CELL_FLOAT));
    w.writeLines(0, 1, aRow.data());
    w.writeLines(3, 1, aRow.data());
    EXPECT_EQ(w.getMaxLineWritten(), 4);
    w.close();
    EXPECT_EQ(fileSize(aHoles), 6 * 12);
    EXPECT_EQ(countOf("WARNING NULL line writed :4 in file :"), 1);

    w.openWrite(CQORV_RF_OPEN_WRITE, param(path("full"), 2, 3, CQORV_CELL_FLOAT));
    std::vector<float> aBoth(6, 1.0f);
    w.writeLines(0, 2, aBoth.data());
    w.close();
    EXPECT_EQ(countOf("WARNING NULL line writed"), 2);
}

// The read window runs forward for lines "INCREASE" and backward for "DECREASE"; a line inside
// the window costs no file access.
TEST_F(RasterFileTest, ReadCacheInBothTimeDirections)
{
    const int aLines = 10, aPixels = 5;
    std::vector<fcomplex> aAll(aLines * aPixels);
    for (int l = 0; l < aLines; ++l)
        for (int c = 0; c < aPixels; ++c) aAll[l * aPixels + c] = fcomplex(float(l), float(c));
    CRasterFileParam p = param(path("cache"), aLines, aPixels, CQORV_CELL_FLOAT_COMPLEX);
    writeBytes(p.mFileName, asBytes(aAll));
    auto aCellAt = [](const uint8_t* theCell) { fcomplex v; std::memcpy(&v, theCell, sizeof v); return v; };

    CRasterFile f;
    f.openRead(p);
    f.setLineCache(4);
    EXPECT_EQ(aCellAt(f.getLine(2)), fcomplex(2, 0));
    EXPECT_EQ(aCellAt(f.getLine(5, 3)), fcomplex(5, 3));
    EXPECT_EQ(f.getLinePosition(), 6);  // window 2..5 read in one go
    EXPECT_EQ(aCellAt(f.getLine(8)), fcomplex(8, 0));
    EXPECT_EQ(f.getLinePosition(), 10);  // window 8..9, cut at the last line
    EXPECT_EQ(aCellAt(f.getLine(1, 4)), fcomplex(1, 4));
    f.close();

    p.mLinesTimeDecrease = true;
    f.openRead(p);
    f.setLineCache(4);
    EXPECT_EQ(aCellAt(f.getLine(7)), fcomplex(7, 0));
    EXPECT_EQ(aCellAt(f.getLine(4, 2)), fcomplex(4, 2));
    EXPECT_EQ(f.getLinePosition(), 8);  // window 4..7
    EXPECT_EQ(aCellAt(f.getLine(2)), fcomplex(2, 0));
    EXPECT_EQ(f.getLinePosition(), 3);  // window 0..2, cut at line 0

    // Typed reads in this direction walk the file backward through the windows.
    std::vector<fcomplex> aLine(aPixels);
    for (int r = 0; r < aLines; ++r) {
        fqorvReadLine(f, aLine.data(), r);
        ASSERT_EQ(aLine[1], fcomplex(float(aLines - 1 - r), 1.0f)) << "row " << r;
    }
    f.close();
}

// Lines written out of order through the write queue land in their places, with no null lines.
TEST_F(RasterFileTest, WriteQueueKeepsOrderAndFlushes)
{
    const int aLines = 7, aPixels = 3;
    const std::string aName = path("queue");
    CRasterFile w;
    w.openWrite(CQORV_RF_OPEN_WRITE, param(aName, aLines, aPixels, CQORV_CELL_FLOAT));
    w.setLineCache(3);
    std::vector<float> aRow(aPixels);
    for (int l : {5, 6, 0, 1, 2, 3, 4}) {
        for (int c = 0; c < aPixels; ++c) aRow[c] = float(l * 10 + c);
        fqorvWriteLine(w, aRow.data(), l);
    }
    w.close();
    EXPECT_EQ(countOf("WARNING NULL line writed"), 0);
    const std::vector<float> aFile = fromBytes<float>(fileBytes(aName).data(), aLines * aPixels);
    for (int l = 0; l < aLines; ++l)
        for (int c = 0; c < aPixels; ++c) EXPECT_EQ(aFile[l * aPixels + c], float(l * 10 + c));
}

// A read past the end of a short file fails with 261125 instead of returning old bytes, on the
// whole-record road, on the per-line road, through the cache and in update status.
TEST_F(RasterFileTest, ShortFileReadFails)
{
    const int aPixels = 4;
    const CRasterFileParam p = param(path("short"), 5, aPixels, CQORV_CELL_FLOAT);
    writeBytes(p.mFileName, pattern(3 * aPixels * 4 + aPixels * 2));  // three lines and a half
    std::vector<float> aLine(aPixels * 2);
    const std::function<void(CRasterFile&)> aRoads[] = {
        [&](CRasterFile& f) { f.openRead(p); f.readLines(2, 1, 0, aPixels - 1, aLine.data()); f.readLines(3, 1, 0, aPixels - 1, aLine.data()); },
        [&](CRasterFile& f) { f.openRead(p); f.readLines(2, 2, 1, 2, aLine.data()); },
        [&](CRasterFile& f) { f.openRead(p); f.setLineCache(8); f.getLine(0); },
        [&](CRasterFile& f) { f.openWrite(CQORV_RF_OPEN_READ_WRITE, p); fqorvReadLine(f, aLine.data(), 4); },
    };
    for (const auto& aRoad : aRoads) {
        CRasterFile f;
        EXPECT_QORV_FAILURE(aRoad(f), CQORV_ERR_RASTER_READ);
        mEnv.reinit();
    }
}

// A sparse file above 2 GB (no disk cost): its last lines are read and written through 64-bit
// offsets on both seek roads.
TEST_F(RasterFileTest, SparseFileBeyondTwoGigabytes)
{
    const int aPixels = 5616, aLines = 48000, aHeader = 100, aRecord = aPixels * 8;
    const int64_t aSize = int64_t(aHeader) + int64_t(aRecord) * aLines;
    ASSERT_GT(aSize, int64_t(1) << 31);
    CRasterFileParam p = param(path("sparse"), aLines, aPixels, CQORV_CELL_FLOAT_COMPLEX);
    p.mHeaderLen = aHeader;
    {
        const int fd = ::open(p.mFileName.c_str(), O_CREAT | O_RDWR | O_TRUNC, 0644);
        ASSERT_GE(fd, 0);
        ASSERT_EQ(::ftruncate(fd, static_cast<off_t>(aSize)), 0);
        std::vector<fcomplex> aLast(aPixels);
        for (int c = 0; c < aPixels; ++c) aLast[c] = fcomplex(float(c), -1.0f);
        ASSERT_EQ(::pwrite(fd, aLast.data(), aRecord, static_cast<off_t>(aSize - aRecord)), aRecord);
        ::close(fd);
    }
    std::vector<fcomplex> aLine(aPixels);
    CRasterFile f;
    f.openRead(p);
    fqorvReadLine(f, aLine.data(), 1);  // the first seek after the open: the ordinary road
    EXPECT_EQ(aLine[3], fcomplex(0.0f, 0.0f));
    EXPECT_TRUE(f.isLongSeek());
    fqorvReadLine(f, aLine.data(), aLines - 1);  // beyond the threshold: the descriptor road
    EXPECT_EQ(aLine[5615], fcomplex(5615.0f, -1.0f));
    fqorvReadLine(f, aLine.data(), 1);  // from beyond the threshold back under it
    EXPECT_EQ(aLine[3], fcomplex(0.0f, 0.0f));
    fqorvReadLine(f, aLine.data(), aLines - 1, 100, 101);
    EXPECT_EQ(aLine[0], fcomplex(100.0f, -1.0f));
    f.close();

    // Update a line above 2 GB in place, and read it back on a fresh open.
    f.openWrite(CQORV_RF_OPEN_READ_WRITE, p);
    std::vector<fcomplex> aNew(aPixels, fcomplex(3.5f, 4.5f));
    fqorvWriteLine(f, aNew.data(), aLines - 2);
    f.close();
    EXPECT_EQ(fileSize(p.mFileName), aSize);
    f.openRead(p);
    fqorvReadLine(f, aLine.data(), aLines - 2);
    EXPECT_EQ(aLine[17], fcomplex(3.5f, 4.5f));
    fqorvReadLine(f, aLine.data(), aLines - 1);
    EXPECT_EQ(aLine[17], fcomplex(17.0f, -1.0f));
    f.close();

    // A new file written at its last line only: 64-bit seek on the write road, nothing completed.
    p.mFileName = path("sparse_new");
    f.openWrite(CQORV_RF_OPEN_WRITE, p);
    fqorvWriteLine(f, aNew.data(), aLines - 1);
    f.close();
    EXPECT_EQ(fileSize(p.mFileName), aSize);
    struct stat s;
    ASSERT_EQ(stat(p.mFileName.c_str(), &s), 0);
    EXPECT_LT(static_cast<long long>(s.st_blocks) * 512, 64LL << 20);  // still sparse
    EXPECT_EQ(countOf("WARNING NULL line writed"), 0);
}

// Each misuse fails with its id and names itself in the trace.
TEST_F(RasterFileTest, RefusalsWithTheirIdsAndWords)
{
    const std::string aName = path("refuse");
    writeBytes(aName, std::vector<uint8_t>(64, 1));
    const CRasterFileParam p = param(aName, 4, 4, CQORV_CELL_FLOAT);
    CRasterFileParam aNoName = p;
    aNoName.mFileName.clear();
    std::vector<float> aBuffer(16);
    CRasterFile f;
    auto aRefused = [&](auto theStatement, int theId, const char* theWords) {
        EXPECT_QORV_FAILURE(theStatement(), theId);
        EXPECT_NE(mEnv.trace().find(theWords), std::string::npos) << theWords;
        mEnv.reinit();
    };
    aRefused([&] { f.close(); }, CQORV_ERR_RASTER_ACCESS, "Error: attempting to close a raster file no file name while it was not open\n");
    aRefused([&] { f.readLines(0, 1, 0, 3, aBuffer.data()); }, CQORV_ERR_RASTER_READ, " while it was not open\n");
    aRefused([&] { f.writeLines(0, 1, aBuffer.data()); }, CQORV_ERR_WRITE_FILE, "Error: attempting to write to the raster file ");
    aRefused([&] { f.openRead(aNoName); }, CQORV_ERR_RASTER_ACCESS, "You have to set the file name in CRasterFileParam \n");
    aRefused([&] { f.openRead(param(path("missing"), 4, 4, CQORV_CELL_FLOAT)); }, CQORV_ERR_MISSING_FILE, "  errno = 2");
    aRefused([&] { f.openWrite(CQORV_RF_OPEN_WRITE, param(path("no/such/dir/x"), 4, 4, CQORV_CELL_FLOAT)); },
             CQORV_ERR_RASTER_ACCESS, "");
    aRefused([&] { f.openRead(param(aName, 4, 4, 15)); }, CQORV_ERR_RASTER_READ, "Error: unsupported raster file type 15");

    f.openRead(p);
    aRefused([&] { f.openRead(p); }, CQORV_ERR_RASTER_ACCESS, " in input mode while it was not closed\n");
    aRefused([&] { f.writeLines(0, 1, aBuffer.data()); }, CQORV_ERR_WRITE_FILE, " while it was open in read mode\n");
    aRefused([&] { f.readLines(0, 0, 0, 3, aBuffer.data()); }, CQORV_ERR_RASTER_READ, " a negative or null number of lines\n");
    aRefused([&] { fqorvReadLine(f, aBuffer.data(), 0, 2, 1); }, CQORV_ERR_RASTER_ACCESS, "theColStart 2");
    aRefused([&] { fqorvReadLine(f, aBuffer.data(), 4); }, CQORV_ERR_RASTER_ACCESS, "");
    f.close();

    f.openWrite(CQORV_RF_OPEN_WRITE, param(path("refuse_out"), 4, 4, CQORV_CELL_FLOAT));
    aRefused([&] { f.readLines(0, 1, 0, 3, aBuffer.data()); }, CQORV_ERR_RASTER_READ, " while it was open in write mode\n");
    aRefused([&] { f.writeLines(0, -1, aBuffer.data()); }, CQORV_ERR_WRITE_FILE, " a negative or null number of lines\n");
    f.close();
}

// A seek that the stream can't do (a pipe) fails the read with 261125 and the seek words.
TEST_F(RasterFileTest, FailedSeekOnAPipe)
{
    const std::string aName = path("pipe");
    ASSERT_EQ(::mkfifo(aName.c_str(), 0600), 0);
    std::thread aWriter([&] {
        const int fd = ::open(aName.c_str(), O_WRONLY);
        std::vector<char> aData(400, 0);
        if (fd >= 0) {
            ssize_t n = ::write(fd, aData.data(), aData.size());
            (void)n;
            ::close(fd);
        }
    });
    std::vector<float> aLine(4);
    {
        CRasterFile f;
        f.openRead(param(aName, 10, 4, CQORV_CELL_FLOAT));
        f.readLines(0, 1, 0, 3, aLine.data());  // sequential: no seek
        EXPECT_QORV_FAILURE(f.readLines(5, 1, 0, 3, aLine.data()), CQORV_ERR_RASTER_READ);
        EXPECT_NE(mEnv.trace().find("FAIL seek AP : "), std::string::npos);
    }
    aWriter.join();
}

// A raster that meets a failure while it is written is closed without the null-line completion:
// it keeps its whole written records only, and the ENVI header beside it goes.
TEST_F(RasterFileTest, FailureLeavesNoClaimedLines)
{
    const std::string aName = path("failed");
    qtest::writeFile(aName + ".hdr", "ENVI\nlines = 10\n");
    auto aWriteThenFail = [&] {
        CRasterFile w;
        w.openWrite(CQORV_RF_OPEN_WRITE, param(aName, 10, 4, CQORV_CELL_FLOAT));
        std::vector<float> aRow(4, 2.0f);
        for (int l = 0; l < 3; ++l) fqorvWriteLine(w, aRow.data(), l);
        fqorvWriteLine(w, aRow.data(), 42);  // a step's fault: the row is outside the image
    };
    EXPECT_QORV_FAILURE(aWriteThenFail(), CQORV_ERR_RASTER_ACCESS);
    EXPECT_EQ(fileSize(aName), 3 * 16);
    EXPECT_FALSE(qtest::fs::exists(aName + ".hdr"));
    EXPECT_EQ(countOf("WARNING NULL line writed"), 0);
    mEnv.reinit();

    // Reading it back as the 10-line raster its header claims fails at the first missing line.
    CRasterFile r;
    r.openRead(param(aName, 10, 4, CQORV_CELL_FLOAT));
    std::vector<float> aRow(4);
    fqorvReadLine(r, aRow.data(), 2);
    EXPECT_QORV_FAILURE(fqorvReadLine(r, aRow.data(), 3), CQORV_ERR_RASTER_READ);
}

// A real write failure (file size limit): 261124, and the file is cut to whole records.
TEST_F(RasterFileTest, WriteFailureCutsToWholeRecords)
{
    const std::string aName = path("limited");
    const int aPixels = 16384, aRecord = aPixels * 4;  // 64 KiB records
    struct rlimit aOld;
    ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &aOld), 0);
    auto aOldHandler = std::signal(SIGXFSZ, SIG_IGN);
    struct rlimit aLimit = aOld;
    aLimit.rlim_cur = 4u << 20;  // 4 MiB: 64 records
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &aLimit), 0);

    CRasterFile w;
    w.openWrite(CQORV_RF_OPEN_WRITE, param(aName, 200, aPixels, CQORV_CELL_FLOAT));
    std::vector<float> aRow(aPixels, 1.0f);
    int aFailedAt = -1;
    for (int l = 0; l < 200 && aFailedAt < 0; ++l) {
        try {
            fqorvWriteLine(w, aRow.data(), l);
        } catch (const qtest::QorvexExit& e) {
            EXPECT_EQ(e.mId, CQORV_ERR_WRITE_FILE);
            aFailedAt = l;
        }
    }
    setrlimit(RLIMIT_FSIZE, &aOld);
    std::signal(SIGXFSZ, aOldHandler);
    ASSERT_GT(aFailedAt, 0);
    EXPECT_TRUE(w.hasFailed());
    EXPECT_NE(mEnv.trace().find("Error: impossible to write record "), std::string::npos);
    mEnv.reinit();
    w.close();
    const long long aSize = fileSize(aName);
    EXPECT_EQ(aSize % aRecord, 0);
    EXPECT_LE(aSize, 64LL * aRecord);
}
