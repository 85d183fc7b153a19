// The FFT work alone of a focusing run, for the ratio that bench_chain.sh reports: LINES forward and
// inverse range transforms of RGFFT points (one per echo line, each on a fresh copy of the echo), then
// BLOCKS omega-k blocks of NAZFT x NRFFT (column transforms, row transforms, 2-D inverse), with
// THREADS threads for the block transforms. Prints the seconds of each part and their sum.
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "qorv_fft.h"
#include "bench_ers_block.h"

namespace {

double fSince(std::chrono::steady_clock::time_point t0)
{
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
}

}  // namespace

int main(int argc, char** argv)
{
    if (argc != 7) {
        std::fprintf(stderr, "usage: bench_chain_fft LINES RGFFT BLOCKS NAZFT NRFFT THREADS\n");
        return 2;
    }
    const long aLines = std::atol(argv[1]);
    const int aRgFft = std::atoi(argv[2]);
    const int aBlocks = std::atoi(argv[3]);
    const int aThreads = std::atoi(argv[6]);

    FftBuffer aEcho(static_cast<std::size_t>(aRgFft)), aLine(static_cast<std::size_t>(aRgFft));
    for (int i = 0; i < aRgFft; ++i) aEcho[static_cast<std::size_t>(i)] = fcomplex(std::sin(0.01f * i), 0.5f);
    const FftPlan1D aForward(aRgFft, FftDirection::Forward);
    const FftPlan1D aInverse(aRgFft, FftDirection::Inverse);
    auto t0 = std::chrono::steady_clock::now();
    for (long l = 0; l < aLines; ++l) {
        std::memcpy(aLine.data(), aEcho.data(), aLine.size() * sizeof(fcomplex));
        aForward.execute(aLine.data());
        aInverse.execute(aLine.data());
    }
    const double aRange = fSince(t0);

    const COmegaKParam p = fqorvBenchErsBlock(std::atoi(argv[4]), std::atoi(argv[5]));
    fqorvFftSetThreads(aThreads);
    double aAzimuth = 0.0;
    if (aBlocks > 0) {
        COmegaKBlockFocuser f(p, aThreads);
        CQorvMatrix<fcomplex>& b = f.block();
        for (std::size_t i = 0; i < b.nRows() * b.nCols(); ++i) b.data()[i] = fcomplex(std::sin(0.001f * (i % 100003)), 0.25f);
        t0 = std::chrono::steady_clock::now();
        for (int k = 0; k < aBlocks; ++k) {
            f.azimuthTransform();
            f.rangeTransform();
            f.inverseTransform();
        }
        aAzimuth = fSince(t0);
    }
    std::printf("range transforms %.3f s, block transforms %.3f s, FFT work %.3f s\n", aRange, aAzimuth, aRange + aAzimuth);
    return 0;
}
