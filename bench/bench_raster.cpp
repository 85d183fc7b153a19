// Raster storage benchmarks.
//
// 1. Sequential whole-line reads, writes and a line-by-line copy of a raster larger than 2 GB
//    (5616 FLOAT_COMPLEX samples per line, 48000 lines, 2.16 GB) against plain reads, writes and a
//    plain copy of the same file in 1 MiB blocks. Every read pass starts with the file's pages
//    dropped from the page cache and every write pass ends with fsync, so the passes run at the
//    speed of the disk. The big files stand in /tmp and are deleted at the end.
//    QORVEX_BENCH_RASTER_LINES sets a smaller line count for a quick run.
// 2. The cost of one typed line read: a 5616-sample ERS raw line (UBYTE_COMPLEX behind a 412-byte
//    prefix) and a FLOAT_COMPLEX line in either byte order, into fcomplex, from a file in the page
//    cache, and the conversion alone from the line cache.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "qorv_raster_file.h"
#include "tools_raster_file_exp.h"

namespace {

constexpr int CPIXELS = 5616;
constexpr int CLINES_BIG = 48000;  // 48000 x 44928 bytes = 2.16 GB, beyond the 2 GB threshold
constexpr std::size_t CBLOCK = 1u << 20;

int bigLines()
{
    const char* aEnv = std::getenv("QORVEX_BENCH_RASTER_LINES");
    return aEnv != nullptr ? std::max(1, std::atoi(aEnv)) : CLINES_BIG;
}

std::string tmpName(const char* theTag)
{
    return std::string("/tmp/qorvex-bench-raster-") + std::to_string(::getpid()) + "-" + theTag;
}

const std::string& bigName() { static const std::string s = tmpName("big.raw"); return s; }
const std::string& copyName() { static const std::string s = tmpName("copy.raw"); return s; }

double seconds(std::chrono::steady_clock::time_point theStart)
{
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - theStart).count();
}

// Drops the file's pages from the page cache, so that the next read comes from the disk.
void dropCache(const std::string& theName)
{
    const int fd = ::open(theName.c_str(), O_RDONLY);
    if (fd < 0) return;
    ::fdatasync(fd);
    ::posix_fadvise(fd, 0, 0, POSIX_FADV_DONTNEED);
    ::close(fd);
}

void syncFile(const std::string& theName)
{
    const int fd = ::open(theName.c_str(), O_RDONLY);
    if (fd < 0) return;
    ::fsync(fd);
    ::close(fd);
}

CRasterFileParam bigParam(const std::string& theName)
{
    CRasterFileParam p;
    p.mFileName = theName;
    p.mNrOfLinesPerImage = bigLines();
    p.mNrOfPixelsPerLine = CPIXELS;
    p.mCellType = CQORV_CELL_FLOAT_COMPLEX;
    return p;
}

// Removes the big files when the program ends, whatever ran.
struct BigFilesRemover {
    ~BigFilesRemover()
    {
        std::remove(bigName().c_str());
        std::remove(copyName().c_str());
    }
} gBigFilesRemover;

// The passes. Each returns its wall time in seconds, reads from the disk and syncs its writes.
double rasterWrite(const std::string& theName)
{
    const int aLines = bigLines();
    std::vector<fcomplex> aLine(CPIXELS);
    const auto aStart = std::chrono::steady_clock::now();
    CRasterFile w;
    w.openWrite(CQORV_RF_OPEN_WRITE, bigParam(theName));
    for (int l = 0; l < aLines; ++l) {
        for (int c = 0; c < CPIXELS; c += 512) aLine[c] = fcomplex(float(l), float(c));
        w.writeLines(l, 1, aLine.data());
    }
    w.close();
    syncFile(theName);
    return seconds(aStart);
}

double plainWrite(const std::string& theName, double theBytes)
{
    std::vector<char> aBlock(CBLOCK, 1);
    const auto aStart = std::chrono::steady_clock::now();
    FILE* f = std::fopen(theName.c_str(), "wb");
    for (double aLeft = theBytes; aLeft > 0;) {
        const std::size_t n = aLeft > CBLOCK ? CBLOCK : static_cast<std::size_t>(aLeft);
        std::fwrite(aBlock.data(), 1, n, f);
        aLeft -= double(n);
    }
    std::fclose(f);
    syncFile(theName);
    return seconds(aStart);
}

double rasterRead()
{
    const int aLines = bigLines();
    std::vector<fcomplex> aLine(CPIXELS);
    dropCache(bigName());
    const auto aStart = std::chrono::steady_clock::now();
    CRasterFile r;
    r.openRead(bigParam(bigName()));
    for (int l = 0; l < aLines; ++l) r.readLines(l, 1, 0, CPIXELS - 1, aLine.data());
    benchmark::DoNotOptimize(aLine.data());
    r.close();
    return seconds(aStart);
}

double plainRead()
{
    std::vector<char> aBlock(CBLOCK);
    dropCache(bigName());
    const auto aStart = std::chrono::steady_clock::now();
    FILE* f = std::fopen(bigName().c_str(), "rb");
    while (std::fread(aBlock.data(), 1, CBLOCK, f) > 0) benchmark::DoNotOptimize(aBlock.data());
    std::fclose(f);
    return seconds(aStart);
}

// Line by line from one raster into another.
double rasterCopy()
{
    const int aLines = bigLines();
    std::vector<fcomplex> aLine(CPIXELS);
    dropCache(bigName());
    const auto aStart = std::chrono::steady_clock::now();
    CRasterFile r, w;
    r.openRead(bigParam(bigName()));
    w.openWrite(CQORV_RF_OPEN_WRITE, bigParam(copyName()));
    for (int l = 0; l < aLines; ++l) {
        r.readLines(l, 1, 0, CPIXELS - 1, aLine.data());
        w.writeLines(l, 1, aLine.data());
    }
    r.close();
    w.close();
    syncFile(copyName());
    return seconds(aStart);
}

// A plain copy of the same file in 1 MiB blocks: the yardstick.
double plainCopy()
{
    std::vector<char> aBlock(CBLOCK);
    dropCache(bigName());
    const auto aStart = std::chrono::steady_clock::now();
    FILE* in = std::fopen(bigName().c_str(), "rb");
    FILE* out = std::fopen(copyName().c_str(), "wb");
    std::size_t n;
    while ((n = std::fread(aBlock.data(), 1, CBLOCK, in)) > 0) std::fwrite(aBlock.data(), 1, n, out);
    std::fclose(in);
    std::fclose(out);
    syncFile(copyName());
    return seconds(aStart);
}

// Sequential line I/O of the 2.16 GB raster against the plain passes. The passes alternate
// (raster first, then plain first) over three rounds and the best time of each counts, so that the
// page cache and the machine's first touch of memory favour neither side. Ratios: raster time /
// plain time (1.0: as fast as the plain pass).
void BM_BigFileSequentialLines(benchmark::State& state)
{
    const double aBytes = double(bigLines()) * CPIXELS * sizeof(fcomplex);
    double aRW = 1e30, aPW = 1e30, aRR = 1e30, aPR = 1e30, aRC = 1e30, aPC = 1e30;
    for (auto _ : state) {
        aRW = std::min(aRW, rasterWrite(bigName()));
        for (int aRound = 0; aRound < 3; ++aRound) {
            const bool aRasterFirst = aRound % 2 == 0;
            if (aRasterFirst) {
                aRR = std::min(aRR, rasterRead());
                aPR = std::min(aPR, plainRead());
                aRC = std::min(aRC, rasterCopy());
                aPC = std::min(aPC, plainCopy());
                aRW = std::min(aRW, rasterWrite(copyName()));
                aPW = std::min(aPW, plainWrite(copyName(), aBytes));
            } else {
                aPR = std::min(aPR, plainRead());
                aRR = std::min(aRR, rasterRead());
                aPC = std::min(aPC, plainCopy());
                aRC = std::min(aRC, rasterCopy());
                aPW = std::min(aPW, plainWrite(copyName(), aBytes));
                aRW = std::min(aRW, rasterWrite(copyName()));
            }
        }
        state.SetIterationTime(aRC);
    }
    state.counters["GB"] = aBytes / 1e9;
    state.counters["raster_read_s"] = aRR;
    state.counters["plain_read_s"] = aPR;
    state.counters["raster_write_s"] = aRW;
    state.counters["plain_write_s"] = aPW;
    state.counters["raster_copy_s"] = aRC;
    state.counters["plain_copy_s"] = aPC;
    state.counters["read_ratio"] = aRR / aPR;
    state.counters["write_ratio"] = aRW / aPW;
    state.counters["copy_ratio"] = aRC / aPC;
    state.counters["plain_copy_MBps"] = aBytes / aPC / 1e6;
    std::remove(bigName().c_str());
    std::remove(copyName().c_str());
}

BENCHMARK(BM_BigFileSequentialLines)->Iterations(1)->UseManualTime()->Unit(benchmark::kSecond);

// ------------------------------------------------------------------------------------------------
// One typed line

constexpr int CSMALL_LINES = 256;

struct SmallFile {
    std::string mName;
    CRasterFileParam mParam;
};

// A 256-line file of the cell type in /tmp, made once per kind.
SmallFile makeSmall(int theCellType, bool theMSBF, int thePrefix, const char* theTag)
{
    SmallFile s;
    s.mName = tmpName(theTag);
    s.mParam.mFileName = s.mName;
    s.mParam.mNrOfLinesPerImage = CSMALL_LINES;
    s.mParam.mNrOfPixelsPerLine = CPIXELS;
    s.mParam.mCellType = theCellType;
    s.mParam.mByteOrderMSBF = theMSBF;
    s.mParam.mRowPrefix = thePrefix;
    s.mParam.mDummyVal = -9999.0;
    const std::size_t aRecord = std::size_t(thePrefix) + std::size_t(CPIXELS) * fqorvCellTypeBytes(theCellType);
    std::vector<uint8_t> aBytes(aRecord * CSMALL_LINES);
    for (std::size_t i = 0; i < aBytes.size(); ++i) aBytes[i] = static_cast<uint8_t>((i * 13) & 0x3f);
    FILE* f = std::fopen(s.mName.c_str(), "wb");
    std::fwrite(aBytes.data(), 1, aBytes.size(), f);
    std::fclose(f);
    return s;
}

void typedRead(benchmark::State& state, int theCellType, bool theMSBF, int thePrefix, const char* theTag, bool theCache)
{
    const SmallFile s = makeSmall(theCellType, theMSBF, thePrefix, theTag);
    CRasterFile r;
    r.openRead(s.mParam);
    if (theCache) r.setLineCache(CSMALL_LINES);
    std::vector<fcomplex> aLine(CPIXELS);
    int aRow = 0;
    for (auto _ : state) {
        fqorvReadLine(r, aLine.data(), aRow);
        benchmark::DoNotOptimize(aLine.data());
        aRow = (aRow + 1) % CSMALL_LINES;
    }
    r.close();
    std::remove(s.mName.c_str());
    state.SetItemsProcessed(state.iterations() * CPIXELS);
    state.SetBytesProcessed(state.iterations() * int64_t(CPIXELS) * fqorvCellTypeBytes(theCellType));
}

void BM_TypedReadErsRawLine(benchmark::State& state)
{
    typedRead(state, CQORV_CELL_UBYTE_COMPLEX, true, 412, "ers.raw", false);
}
void BM_TypedReadFloatComplexLine(benchmark::State& state)
{
    typedRead(state, CQORV_CELL_FLOAT_COMPLEX, false, 0, "slc.raw", false);
}
void BM_TypedReadFloatComplexSwappedLine(benchmark::State& state)
{
    typedRead(state, CQORV_CELL_FLOAT_COMPLEX, true, 0, "slc_msbf.raw", false);
}
void BM_TypedConvertErsRawLineFromCache(benchmark::State& state)
{
    typedRead(state, CQORV_CELL_UBYTE_COMPLEX, true, 412, "ers_cache.raw", true);
}
void BM_TypedConvertFloatComplexLineFromCache(benchmark::State& state)
{
    typedRead(state, CQORV_CELL_FLOAT_COMPLEX, false, 0, "slc_cache.raw", true);
}

// Typed write of one SLC line (fcomplex into FLOAT_COMPLEX), file in the page cache.
void BM_TypedWriteFloatComplexLine(benchmark::State& state)
{
    const std::string aName = tmpName("slc_write.raw");
    CRasterFileParam p;
    p.mFileName = aName;
    p.mNrOfLinesPerImage = CSMALL_LINES;
    p.mNrOfPixelsPerLine = CPIXELS;
    p.mCellType = CQORV_CELL_FLOAT_COMPLEX;
    CRasterFile w;
    w.openWrite(CQORV_RF_OPEN_WRITE, p);
    std::vector<fcomplex> aLine(CPIXELS, fcomplex(1.0f, -1.0f));
    int aRow = 0;
    for (auto _ : state) {
        fqorvWriteLine(w, aLine.data(), aRow);
        aRow = (aRow + 1) % CSMALL_LINES;
    }
    w.close();
    std::remove(aName.c_str());
    state.SetItemsProcessed(state.iterations() * CPIXELS);
    state.SetBytesProcessed(state.iterations() * int64_t(CPIXELS) * 8);
}

BENCHMARK(BM_TypedReadErsRawLine);
BENCHMARK(BM_TypedReadFloatComplexLine);
BENCHMARK(BM_TypedReadFloatComplexSwappedLine);
BENCHMARK(BM_TypedConvertErsRawLineFromCache);
BENCHMARK(BM_TypedConvertFloatComplexLineFromCache);
BENCHMARK(BM_TypedWriteFloatComplexLine);

}  // namespace

BENCHMARK_MAIN();
