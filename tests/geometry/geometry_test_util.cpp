#include "geometry_test_util.h"

#include <stdexcept>

#include "qorv_sim_header.h"
#include "qorv_sim_truth.h"

CSimProductHeader::CSimProductHeader(const char* thePreset, long thePulses, int theSamples)
{
    if (!fqorvSimApplyPreset(mScene, thePreset, false)) throw std::runtime_error("unknown preset");
    mScene.mPulses = thePulses;
    mScene.mSamples = theSamples;
    mScene.mGrid = {1, 1};
    fqorvSimCompleteScene(mScene);
    mOrbit = fqorvSimMakeOrbit(mScene);
    mTimeline = std::make_unique<CSimTimeline>(mScene);
    const CSimSceneTruth aTruth = fqorvSimComputeTruth(mScene, *mOrbit, *mTimeline);
    mHeader = CDescriptionHeader::makeFull();
    fqorvSimFillHeader(*mHeader, mScene, *mTimeline, *mOrbit, aTruth);
}
