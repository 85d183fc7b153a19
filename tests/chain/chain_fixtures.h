// Small raw products for the driver's process tests, written with the project's store and raster.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace qtest {

struct SmallRawOptions {
    std::string mSensor = "ERS-2";
    int mLines = 40;
    int mPixels = 64;
    int mPriCode = 2820;        // PRI code of every line ...
    int mChangeLine = -1;       // ... up to this line, from which on
    int mChangedCode = 2800;    // this one
    bool mWithVelocity = true;  // "Processing.ProcessingVelocity" in the header
};

/// Writes theRaw (UBYTE_COMPLEX lines with 412-byte big-endian prefixes) and theRaw.sml.
/// Needs the runtime up (an InProcessEnvironment) for the store's key files.
void writeSmallRawProduct(const std::filesystem::path& theRaw, const SmallRawOptions& theOptions = {});

}  // namespace qtest
