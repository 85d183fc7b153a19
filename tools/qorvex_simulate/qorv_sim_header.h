// The ".sml" header of a simulated raw product: every field the chain reads from a raw product
// of the scene's sensor, filled through the parameter store.
#pragma once

#include "qorv_description_section.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_truth.h"

/// Fills theHeader (a full 21-section header) for the raw raster of a completed scene: sizes,
/// cell type, prefix, radar, window (Processing.SlantRange/FastTime of the first pulse's window),
/// dates, state vectors (ECR), scene centre and the true effective velocity. The Doppler is left
/// to the chain's estimator unless the scene asks for a one-row "Processing.DopCenRangeCoeff".
void fqorvSimFillHeader(CDescriptionHeader& theHeader, const CSimScene& theScene, const CSimTimeline& theTimeline,
                        const CSimOrbit& theOrbit, const CSimSceneTruth& theTruth);
