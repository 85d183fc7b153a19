// Test support of the geometry library: simulated raw-product headers held in memory.
#pragma once

#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorv_sim_orbit.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"

/// A simulator scene of a preset with its exact orbit, its timeline and the header of its raw
/// product (filled as the simulator writes it; no raster).
struct CSimProductHeader {
    CSimProductHeader(const char* thePreset, long thePulses, int theSamples);
    CSimScene mScene;
    std::unique_ptr<CSimOrbit> mOrbit;
    std::unique_ptr<CSimTimeline> mTimeline;
    std::unique_ptr<CDescriptionHeader> mHeader;
};
