// Output of a simulation: the raw raster (through CRasterFile), its ".sml" header (through the
// parameter store) and the truth file, streamed block by block with bounded memory.
//
// A root R gives R (raster), R.sml and R_truth.json. The raster is written under R.part and renamed
// at its end, the truth file next, the header last (each atomically): a product whose R.sml exists
// is complete, and stale files of an earlier run under the same root are removed first.
// A scene for a native ERS archive gives the archive (the CEOS directory R, or R.E2 / R.E1) and
// R_truth.json: the archive is written under its ".part" name, the truth file next, and the
// archive renamed into place last. An ALOS scene gives the product directory R (leader and image
// files) and R_truth.json the same way.
#pragma once

#include <functional>
#include <string>

#include "qorv_sim_scene.h"

/// Figures of a run.
struct CSimRunReport {
    std::string mRaster, mHeader, mTruth;  // paths (a native archive: mRaster, no header)
    long mPulses = 0;
    long mRecords = 0;
    std::size_t mTargets = 0;              // listed targets
    std::size_t mScatterers = 0;
    double mGain = 0.0;                    // 5-bit codes per unit amplitude
    double mClippedFraction = 0.0;
    double mSeconds = 0.0;                 // wall time of the whole run
    double mEchoSeconds = 0.0;             // wall time of generation and writing of the raster
    int mThreads = 1;
};

/// Progress callback: percent done (0 .. 100).
using CSimProgress = std::function<void(int thePercent)>;

/// Simulates a completed scene into theRoot, theRoot.sml and theRoot_truth.json. Failures of the
/// raster or the store go through the system's failure road; a file that can't be renamed into
/// place throws std::runtime_error.
CSimRunReport fqorvSimRun(const CSimScene& theScene, const std::string& theRoot, const CSimProgress& theProgress = {});

/// Writes only the raster of a completed scene to thePath (no rename, no header, no truth); the
/// figures go to theReport. For benchmarks and tests.
void fqorvSimWriteRaster(const CSimScene& theScene, const std::string& thePath, CSimRunReport& theReport,
                         const CSimProgress& theProgress = {});
