// The transform wrapper: the per-line cost of range compression's forward and inverse transform
// of a full ERS line, and a 2-D block such as the azimuth focusing works on, with 1 and 2 threads.
#include <benchmark/benchmark.h>

#include <cmath>

#include "qorv_fft.h"

namespace {

void fillBlock(FftBuffer& theBuffer)
{
    for (std::size_t i = 0; i < theBuffer.size(); ++i)
        theBuffer[i] = fcomplex(std::sin(0.001f * static_cast<float>(i)), std::cos(0.003f * static_cast<float>(i)));
}

/// One forward and one inverse transform of a line of n samples (ERS: 5616).
void BM_LineForwardInverse(benchmark::State& theState)
{
    const int n = static_cast<int>(theState.range(0));
    FftPlan1D aForward(n, FftDirection::Forward), aInverse(n, FftDirection::Inverse);
    FftBuffer aLine(static_cast<std::size_t>(n));
    fillBlock(aLine);
    for (auto _ : theState) {
        aForward.execute(aLine.data());
        aInverse.execute(aLine.data());
        benchmark::ClobberMemory();
    }
    theState.SetItemsProcessed(theState.iterations());
}
BENCHMARK(BM_LineForwardInverse)->Arg(5616)->Arg(8192)->Unit(benchmark::kMicrosecond);

/// A 2-D forward transform of an azimuth block (rows x cols), with a given number of threads.
void BM_Block2D(benchmark::State& theState)
{
    const int aRows = static_cast<int>(theState.range(0)), aCols = static_cast<int>(theState.range(1));
    fqorvFftSetThreads(static_cast<int>(theState.range(2)));
    FftPlan2D aPlan(aRows, aCols, FftDirection::Forward, true);
    FftBuffer aBlock(static_cast<std::size_t>(aRows) * aCols);
    fillBlock(aBlock);
    for (auto _ : theState) {
        aPlan.execute(aBlock.data());
        benchmark::ClobberMemory();
    }
    fqorvFftSetThreads(1);
}
BENCHMARK(BM_Block2D)->Args({4096, 2048, 1})->Args({4096, 2048, 2})->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace

BENCHMARK_MAIN();
