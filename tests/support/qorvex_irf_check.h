// Point targets of a focused SLC held to their ideal responses, measured by the qorvex_irf program.
#pragma once

#include <cstddef>
#include <filesystem>

#include "qorvex_test_support.h"

namespace qtest {

/// Measures the isolated targets of theSlc against theTruth with qorvex_irf (run in theBox) and
/// holds each to the ideal: position within 0.1 pixel and 0.25 line, 3 dB widths within 5 %, PSLR
/// and ISLR within 1.5 dB (the azimuth PSLR within theAzimuthPslrDb). theTargets: the number
/// expected (0: any, and the table is printed).
void expectIdealTargets(const DriverSandbox& theBox, const std::filesystem::path& theSlc,
                        const std::filesystem::path& theTruth, std::size_t theTargets, double theAzimuthPslrDb = 1.5,
                        double theLineError = 0.25, double thePixelError = 0.1);

}  // namespace qtest
