// Omega-k focusing: one block of 8192 x 5616 samples (a full ERS line) through the whole block
// focuser (column FFTs, Stolt mapping, row FFTs, reference phase, 2-D inverse), against the FFT work
// alone of the same block measured in the same run, on 1 and 2 threads. Also the reference phase
// by its recurrences against the direct sine and cosine per sample. Prints seconds and ratios.
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <functional>

#include "qorv_fft.h"
#include "bench_ers_block.h"

namespace {

double fSeconds(const std::function<void()>& theWork)
{
    const auto t0 = std::chrono::steady_clock::now();
    theWork();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
}

void fFill(COmegaKBlockFocuser& theFocuser)
{
    CQorvMatrix<fcomplex>& b = theFocuser.block();
    for (std::size_t i = 0; i < b.nRows() * b.nCols(); ++i)
        b.data()[i] = fcomplex(std::sin(0.001f * static_cast<float>(i % 100003)), std::cos(0.003f * static_cast<float>(i % 99991)));
}

}  // namespace

int main(int argc, char** argv)
{
    const COmegaKParam p = fqorvBenchErsBlock(argc > 1 ? std::atoi(argv[1]) : 8192, argc > 2 ? std::atoi(argv[2]) : 5616);
    std::printf("omega-k block %d x %d\n", p.mAzimuthFftSize, p.mRangeFftSize);
    for (int aThreads : {1, 2}) {
        fqorvFftSetThreads(aThreads);
        COmegaKBlockFocuser f(p, aThreads);
        f.setDoppler(290.0, 1414, 0.0);
        fFill(f);
        const double aFft = fSeconds([&] {
            f.azimuthTransform();
            f.rangeTransform();
            f.inverseTransform();
        });
        fFill(f);
        double aStolt = 0.0, aPhase = 0.0;
        const double aBlock = fSeconds([&] {
            f.azimuthTransform();
            aStolt = fSeconds([&] { f.stoltMapping(); });
            f.rangeTransform();
            aPhase = fSeconds([&] { f.referencePhase(); });
            f.inverseTransform();
        });
        const double aDirect = fSeconds([&] { f.referencePhaseDirect(); });
        std::printf("threads %d: block %.3f s, FFT work alone %.3f s, ratio %.2f | Stolt %.3f s, reference phase %.3f s "
                    "(direct sine and cosine %.3f s, ratio %.2f)\n",
                    aThreads, aBlock, aFft, aBlock / aFft, aStolt, aPhase, aDirect, aDirect / aPhase);
    }
    return 0;
}
