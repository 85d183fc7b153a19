// Normalisation of a full-frame SLC in place (28,000 x 4,912 FLOAT_COMPLEX samples, 1.1 GB, as
// step 5 leaves it), against a plain in-place pass over the same file (1 MiB reads and writes
// back) in the same run. The file is in the page cache, as it is right after the block loop.
// Prints seconds and the ratio; QORVEX_BENCH_NORMALIZE_LINES sets a smaller line count.
#include <fcntl.h>
#include <unistd.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "qorv_description_section.h"
#include "qorv_raster_file.h"
#include "qorv_raster_utility.h"
#include "qorvex_test_support.h"
#include "tools_raster_file_exp.h"

namespace {

double fSeconds(const std::function<void()>& theWork)
{
    const auto t0 = std::chrono::steady_clock::now();
    theWork();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
}

void fWriteSlc(const std::string& theName, int theLines, int thePixels)
{
    auto h = CDescriptionHeader::makeFull();
    (*h)["RasterInfo.NrOfLinesPerImage"].setValue(theLines);
    (*h)["RasterInfo.NrOfPixelsPerLine"].setValue(thePixels);
    (*h)["RasterInfo.CellType"].setValue("FLOAT_COMPLEX");
    (*h)["RasterInfo.DataUnits"].setValue("SLC");
    (*h)["RasterInfo.BytesOrder"].setValue("LSBF");
    for (const char* k : {"RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix"}) (*h)[k].setValue(0);
    (*h)["RasterInfo.NullCellValue"].setValue(-9999.0);
    if (!h->write((theName + "_hdr").c_str(), true, false)) std::exit(1);
    CRasterFileParam p;
    fqorvRasterParamFromHeader(*h, theName.c_str(), p);
    CRasterFile f;
    f.openWrite(CQORV_RF_OPEN_WRITE, p);
    std::vector<fcomplex> aLine(static_cast<std::size_t>(thePixels));
    for (int r = 0; r < theLines; ++r) {
        for (int c = 0; c < thePixels; ++c) aLine[c] = std::polar(3.0f + 0.001f * static_cast<float>(c % 97), 0.01f * static_cast<float>(r + c));
        fqorvWriteLine(f, aLine.data(), r);
    }
    f.close();
}

/// Reads the whole file in 1 MiB blocks and writes each block back where it was.
void fPlainPass(const std::string& theName)
{
    const int fd = open(theName.c_str(), O_RDWR);
    std::vector<char> b(1u << 20);
    off_t at = 0;
    for (ssize_t n; (n = pread(fd, b.data(), b.size(), at)) > 0; at += n)
        if (pwrite(fd, b.data(), static_cast<std::size_t>(n), at) != n) std::exit(1);
    close(fd);
}

}  // namespace

int main()
{
    const char* aLinesEnv = std::getenv("QORVEX_BENCH_NORMALIZE_LINES");
    const int aLines = aLinesEnv != nullptr ? std::atoi(aLinesEnv) : 28000, aPixels = 4912;
    qtest::InProcessEnvironment aEnv;
    const std::string aName = aEnv.workPath("bench_slc").string();
    fWriteSlc(aName, aLines, aPixels);
    std::printf("normalisation of a %d x %d FLOAT_COMPLEX SLC (%.2f GB) in place\n", aLines, aPixels,
                8.0 * aLines * aPixels / 1e9);
    for (int aRound = 0; aRound < 2; ++aRound) {
        const double aPlain = fSeconds([&] { fPlainPass(aName); });
        const double aNorm = fSeconds([&] { fqorvNormalizeRaster(aName.c_str(), aName.c_str(), 16000.0, 0.0, false, nullptr, 0.3333); });
        std::printf("round %d: normalisation %.3f s, plain read and write-back pass %.3f s, ratio %.2f\n", aRound + 1, aNorm,
                    aPlain, aNorm / aPlain);
    }
    std::filesystem::remove(aName);
    return 0;
}
