// Raw-data simulator: the cost of one echo line of a full ERS frame (300 targets), of its noise and
// quantisation, of setting a scene up, and of whole scenes streamed to a raster file (the default
// demo scene and a full ERS frame of 28,000 lines x 5,616 samples).
//
// Read: "pulses/s" of BM_EchoLine is the rate of noise-free echo lines; "samples/s" counts target
// samples (one target's chirp samples in one line). The scene benchmarks give the wall time of a
// whole raster on all cores, header and truth file aside (those take milliseconds).
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

#include "qorv_sim_echo.h"
#include "qorv_sim_format.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_writer.h"

namespace {

CSimScene completedScene(bool theFullFrame)
{
    CSimScene s;
    fqorvSimApplyPreset(s, "ers2", theFullFrame);
    fqorvSimCompleteScene(s);
    return s;
}

/// A full ERS frame with its generator, made once.
struct FullFrame {
    FullFrame() : s(completedScene(true)), orbit(fqorvSimMakeOrbit(s)), tl(s), gen(s, *orbit, tl) {}
    CSimScene s;
    std::unique_ptr<CSimOrbit> orbit;
    CSimTimeline tl;
    CSimEchoGenerator gen;
};

FullFrame& fullFrame()
{
    static FullFrame f;
    return f;
}

void BM_EchoLine(benchmark::State& state)
{
    FullFrame& f = fullFrame();
    std::vector<CSimSample> aLine(static_cast<std::size_t>(f.s.mSamples));
    // Lines across the frame, so that every target's aperture is met in turn.
    long k = 0, aTargetSamples = 0;
    const long aReplica = fqorvSimReplicaPoints(f.s.mRadar);
    for (auto _ : state) {
        f.gen.echo(k, aLine.data());
        benchmark::DoNotOptimize(aLine.data());
        for (std::size_t i = 0; i < f.s.mTargets.size(); ++i)
            aTargetSamples += (k >= f.gen.firstPulse(i) && k <= f.gen.lastPulse(i)) ? aReplica : 0;
        k = (k + 97) % f.s.mPulses;
    }
    state.counters["pulses/s"] = benchmark::Counter(static_cast<double>(state.iterations()), benchmark::Counter::kIsRate);
    state.counters["samples/s"] = benchmark::Counter(static_cast<double>(aTargetSamples), benchmark::Counter::kIsRate);
}
BENCHMARK(BM_EchoLine)->Unit(benchmark::kMicrosecond);

void BM_NoiseAndQuantise(benchmark::State& state)
{
    FullFrame& f = fullFrame();
    std::vector<CSimSample> aLine(static_cast<std::size_t>(f.s.mSamples));
    std::vector<uint8_t> aCodes(2 * aLine.size());
    std::vector<float> aFloats(2 * aLine.size());
    long k = 0;
    for (auto _ : state) {
        std::fill(aLine.begin(), aLine.end(), CSimSample(0.0, 0.0));
        f.gen.addNoise(k++, aLine.data());
        if (state.range(0) == 0)
            benchmark::DoNotOptimize(fqorvSimQuantise5Bit(aLine.data(), f.s.mSamples, 0.7, aCodes.data()));
        else
            benchmark::DoNotOptimize(fqorvSimQuantiseBaq4Bit(aLine.data(), f.s.mSamples, aFloats.data()));
    }
    state.SetLabel(state.range(0) == 0 ? "noise + 5-bit" : "noise + 4-bit BAQ");
    state.counters["lines/s"] = benchmark::Counter(static_cast<double>(state.iterations()), benchmark::Counter::kIsRate);
}
BENCHMARK(BM_NoiseAndQuantise)->Arg(0)->Arg(1)->Unit(benchmark::kMicrosecond);

void BM_SceneSetup(benchmark::State& state)
{
    // Orbit placement, window, the 300-target grid and every target's illumination.
    for (auto _ : state) {
        CSimScene s = completedScene(true);
        const std::unique_ptr<CSimOrbit> o = fqorvSimMakeOrbit(s);
        const CSimTimeline tl(s);
        const CSimEchoGenerator g(s, *o, tl);
        benchmark::DoNotOptimize(g.noiseVariance());
    }
}
BENCHMARK(BM_SceneSetup)->Unit(benchmark::kMillisecond)->Iterations(3);

void writeScene(benchmark::State& state, bool theFullFrame)
{
    const CSimScene s = completedScene(theFullFrame);
    const std::string aPath = (std::filesystem::temp_directory_path() / "qorvex_bench_simulate_raw").string();
    CSimRunReport r;
    for (auto _ : state) {
        r = CSimRunReport{};
        fqorvSimWriteRaster(s, aPath, r);
    }
    std::filesystem::remove(aPath);
    state.SetLabel(std::to_string(s.mPulses) + " x " + std::to_string(s.mSamples) + ", " +
                   std::to_string(s.mTargets.size()) + " targets, " + std::to_string(r.mThreads) + " threads");
    state.counters["lines/s"] =
        benchmark::Counter(static_cast<double>(s.mPulses) * state.iterations(), benchmark::Counter::kIsRate);
}

void BM_DemoScene(benchmark::State& state) { writeScene(state, false); }
BENCHMARK(BM_DemoScene)->Unit(benchmark::kMillisecond)->UseRealTime()->Iterations(3);

void BM_FullErsFrame(benchmark::State& state) { writeScene(state, true); }
BENCHMARK(BM_FullErsFrame)->Unit(benchmark::kSecond)->UseRealTime()->Iterations(1);

}  // namespace

BENCHMARK_MAIN();
