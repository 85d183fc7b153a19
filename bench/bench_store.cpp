// Parameter store benchmarks: header files with large tables.
//
// The header is a full 21-section header holding a 100,000-element double vector
// ("orbit_information.Time") and a 20,000 x 4 double matrix ("Processing.DopCenRangeCoeff"), some
// 7 MB of XML. Measured: writing it (".sml", atomically), reading it back into a full header, the
// XML parse alone, building an empty full header (21 key files), and reading a typical raw ERS
// header of a few kilobytes. The runtime runs in a temporary working directory with the delivered
// key files.
#include <benchmark/benchmark.h>

#include <cmath>
#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorv_description_xml.h"
#include "qorvex_test_support.h"

namespace {

constexpr int CVECTOR = 100000;
constexpr int CROWS = 20000;
constexpr int CCOLS = 4;

qtest::InProcessEnvironment* gEnv = nullptr;

std::string path(const char* theName) { return gEnv->workPath(theName).string(); }

std::unique_ptr<CDescriptionHeader> makeBigHeader()
{
    auto aHeader = CDescriptionHeader::makeFull();
    CDescriptionHeader& h = *aHeader;
    h["orbit_information.Time"].resize(1, CVECTOR);
    for (int i = 0; i < CVECTOR; ++i) h["orbit_information.Time"].setValue(i, 35000.0 + i / 1679.902394);
    h["Processing.DopCenRangeCoeff"].resize(CROWS, CCOLS);
    for (int r = 0; r < CROWS; ++r)
        for (int c = 0; c < CCOLS; ++c) h["Processing.DopCenRangeCoeff"].setValue(r, c, std::sin(r * 0.001 + c) * 1e3);
    h["Sensor.SensorName"].setValue("ERS-2");
    h["RasterInfo.NrOfPixelsPerLine"].setValue(5616);
    return aHeader;
}

void BM_WriteBigHeader(benchmark::State& theState)
{
    auto aHeader = makeBigHeader();
    const std::string aPath = path("big_hdr");
    for (auto _ : theState) benchmark::DoNotOptimize(aHeader->write(aPath.c_str(), true, false));
}
BENCHMARK(BM_WriteBigHeader)->Unit(benchmark::kMillisecond);

void BM_ReadBigHeader(benchmark::State& theState)
{
    makeBigHeader()->write(path("big_hdr").c_str(), true, false);
    auto aHeader = CDescriptionHeader::makeFull();
    const std::string aPath = path("big_hdr");
    for (auto _ : theState) benchmark::DoNotOptimize(aHeader->read(aPath.c_str(), true));
    if ((*aHeader)["orbit_information.Time"].getNbrOfElements() != CVECTOR) theState.SkipWithError("wrong size");
}
BENCHMARK(BM_ReadBigHeader)->Unit(benchmark::kMillisecond);

void BM_ParseBigHeaderOnly(benchmark::State& theState)
{
    makeBigHeader()->write(path("big_hdr").c_str(), true, false);
    const std::string aPath = path("big.sml");
    for (auto _ : theState)
        benchmark::DoNotOptimize(fqorv_xml_parser(CQORV_XML_MAX_NODES_READ, CQORV_XML_MAX_DEPTH, aPath.c_str(), 1000000));
}
BENCHMARK(BM_ParseBigHeaderOnly)->Unit(benchmark::kMillisecond);

void BM_BuildFullHeader(benchmark::State& theState)
{
    for (auto _ : theState) benchmark::DoNotOptimize(CDescriptionHeader::makeFull());
}
BENCHMARK(BM_BuildFullHeader)->Unit(benchmark::kMicrosecond);

void BM_ReadTypicalRawHeader(benchmark::State& theState)
{
    {
        auto aHeader = CDescriptionHeader::makeFull();
        CDescriptionHeader& h = *aHeader;
        h["Sensor.SensorName"].setValue("ERS-2");
        h["RasterInfo.NrOfPixelsPerLine"].setValue(5616);
        h["RasterInfo.NrOfLinesPerImage"].setValue(28000);
        for (const char* aKey : {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z",
                                 "StateVectorData.vel_x", "StateVectorData.vel_y", "StateVectorData.vel_z"}) {
            h[aKey].resize(1, 9);
            for (int i = 0; i < 9; ++i) h[aKey].setValue(i, 4868583.668 + i);
        }
        h.write(path("raw_hdr").c_str(), true, false);
    }
    auto aHeader = CDescriptionHeader::makeFull();
    const std::string aPath = path("raw_hdr");
    for (auto _ : theState) benchmark::DoNotOptimize(aHeader->read(aPath.c_str(), true));
}
BENCHMARK(BM_ReadTypicalRawHeader)->Unit(benchmark::kMicrosecond);

}  // namespace

int main(int argc, char** argv)
{
    qtest::InProcessEnvironment aEnv;
    gEnv = &aEnv;
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    gEnv = nullptr;
    return 0;
}
