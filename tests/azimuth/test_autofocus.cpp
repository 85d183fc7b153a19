// Step 3, autofocus, through the driver: a simulated ERS scene whose header velocity is 1 % above
// or below the truth is focused after the chain's three autofocus runs; the processing velocity
// they leave must lie within 0.2 % of the scene's true effective velocity.
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

TEST(Autofocus, ThreeRunsBringTheVelocityWithinTwoPerMilleOfTheTruth)
{
    for (const double aFactor : {1.01, 0.99}) {
        SCOPED_TRACE(aFactor);
        qtest::DriverSandbox aBox;
        const fs::path aRaw = aBox.data() / "scene_raw";
        const std::vector<std::string> aScene = {"--preset", "ers2", "--lines", "4096", "--samples", "1280", "--targets", "grid:3x3",
                                                 "--scatterers", "800", "--write-doppler"};
        ASSERT_EQ(aBox.simulate(aRaw.string(), aScene).mStatus, 0);
        const double aTrue = CJson::parseFile(aRaw.string() + "_truth.json")["velocity"]["true_processing_velocity"].number();
        {
            qtest::InProcessEnvironment aEnv;
            auto h = CDescriptionHeader::makeFull();
            ASSERT_TRUE(h->read((aRaw.string() + "_hdr").c_str(), true));
            (*h)["Processing.ProcessingVelocity"].setValue(0, aTrue * aFactor);
            ASSERT_TRUE(h->write((aRaw.string() + "_hdr").c_str(), true, false));
        }
        auto aArgs = qtest::DriverSandbox::defaultArguments(aRaw, aBox.data() / "scene_slc");
        aArgs[15] = "OK";  // the header carries the Doppler centroid: steps 0, 2, 3, 3, 3 and 5
        const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 600);
        ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr << qtest::readFile(aBox.workingFile());
        EXPECT_TRUE(fs::exists(aBox.data() / "scene_slc"));

        qtest::InProcessEnvironment aEnv;
        CDescriptionHeader p({"sar_processing"});
        ASSERT_TRUE(p.read((aBox.data() / "scene_par").c_str(), true));
        EXPECT_NEAR(p["sar_processing.Velocity"].getDouble() / aTrue, 1.0, 0.002);
        const std::string aTrace = qtest::readFile(aBox.work() / "Process.trace");
        std::size_t aRuns = 0;
        for (std::size_t at = aTrace.find("new estimate of the processing velocity"); at != std::string::npos;
             at = aTrace.find("new estimate of the processing velocity", at + 1))
            ++aRuns;
        EXPECT_EQ(aRuns, 3u);
    }
}

}  // namespace
