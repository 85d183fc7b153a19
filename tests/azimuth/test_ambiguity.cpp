// Step 4, Doppler ambiguity, through the driver: simulated ERS scenes whose true centroid lies 0, 1
// or 2 PRF above or below the baseband value in the header. The step must find that number and
// leave the true centroid in the range compressed product's header.
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <string>
#include <vector>

#include "qorv_description_section.h"
#include "qorv_json.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

TEST(DopplerAmbiguity, TheMissingPrfCyclesAreFoundAndAddedToTheHeader)
{
    const double aBaseband = 290.0;
    for (const int aCycles : {1, -1, 2, -2, 0}) {
        SCOPED_TRACE(aCycles);
        qtest::DriverSandbox aBox;
        const fs::path aRaw = aBox.data() / "scene_raw";
        const double aPrf = 1679.9023936391638;
        const std::vector<std::string> aScene = {
            "--preset", "ers2", "--lines", "2048", "--samples", "1024", "--targets", "grid:3x3", "--scatterers", "400",
            "--doppler-centroid", std::to_string(aBaseband + aCycles * aPrf)};
        ASSERT_EQ(aBox.simulate(aRaw.string(), aScene).mStatus, 0);
        const CJson aTruth = CJson::parseFile(aRaw.string() + "_truth.json");
        ASSERT_NEAR(aTruth["radar"]["prf"].number(), aPrf, 1e-6);
        {  // the header holds the baseband centroid, as an estimate from the echoes would
            qtest::InProcessEnvironment aEnv;
            auto h = CDescriptionHeader::makeFull();
            ASSERT_TRUE(h->read((aRaw.string() + "_hdr").c_str(), true));
            (*h)["Processing.DopCenRangeCoeff"].resize(1, 1);
            (*h)["Processing.DopCenRangeCoeff"].setValue(0, 0, aBaseband);
            ASSERT_TRUE(h->write((aRaw.string() + "_hdr").c_str(), true, false));
        }
        auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, aBox.data() / "scene_slc");
        aArgs[10] = "OK";                 // ambiguity resolution
        aArgs[15] = aArgs[17] = "OK";     // steps 0, 2, 4 and 5
        const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 600);
        ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr << qtest::readFile(aBox.workingFile());
        EXPECT_NE(qtest::readFile(aBox.work() / "Process.trace").find(", rounded: " + std::to_string(aCycles)), std::string::npos);

        qtest::InProcessEnvironment aEnv;
        auto h = CDescriptionHeader::makeFull();
        ASSERT_TRUE(h->read((aBox.data() / "scene_rc_hdr").c_str(), true));
        EXPECT_NEAR(h->getField("Processing.DopCenRangeCoeff").getDouble(0, 0), aBaseband + aCycles * aPrf, 1e-6);
        std::string aKey;
        EXPECT_TRUE(fqorvGetUserKey(*h, "DOPPLER VALUE AFTER AMBIGUITY CORRECTION (0   0)", aKey));
    }
}

}  // namespace
