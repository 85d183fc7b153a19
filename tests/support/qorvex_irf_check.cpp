#include "qorvex_irf_check.h"

#include <cstdio>

#include <gtest/gtest.h>

#include "qorv_json.h"

namespace qtest {

void expectIdealTargets(const DriverSandbox& theBox, const std::filesystem::path& theSlc,
                        const std::filesystem::path& theTruth, std::size_t theTargets, double theAzimuthPslrDb,
                        double theLineError, double thePixelError)
{
    const auto aReport = theSlc.string() + "_irf.json";
    const RunResult aIrf = runProgram(
        binaryDir() / "qorvex_irf",
        {"--slc", theSlc.string(), "--truth", theTruth.string(), "--json", aReport, "--only-isolated"},
        {{"QORVEX_INIT_DIR", theBox.etc().string()}}, theBox.data());
    ASSERT_EQ(aIrf.mStatus, 0) << aIrf.mStdout << aIrf.mStderr;
    SCOPED_TRACE(aIrf.mStdout);
    const CJson aResult = CJson::parseFile(aReport);
    const CJson& aIdeal = aResult["ideal"];
    if (theTargets > 0) {
        ASSERT_EQ(aResult["targets"].size(), theTargets);
    } else {
        std::printf("%s", aIrf.mStdout.c_str());
    }
    for (std::size_t k = 0; k < aResult["targets"].size(); ++k) {
        const CJson& t = aResult["targets"][k];
        SCOPED_TRACE(t["id"].string());
        ASSERT_TRUE(t["found"].boolean());
        EXPECT_NEAR(t["line_error"].number(), 0.0, theLineError);
        EXPECT_NEAR(t["pixel_error"].number(), 0.0, thePixelError);
        for (const char* aDir : {"range", "azimuth"}) {
            EXPECT_NEAR(t[aDir]["irw"].number() / aIdeal[aDir]["irw"].number(), 1.0, 0.05) << aDir;
            EXPECT_NEAR(t[aDir]["pslr_db"].number(), aIdeal[aDir]["pslr_db"].number(),
                        aDir[0] == 'a' ? theAzimuthPslrDb : 1.5) << aDir;
            EXPECT_NEAR(t[aDir]["islr_db"].number(), aIdeal[aDir]["islr_db"].number(), 1.5) << aDir;
        }
    }
}

}  // namespace qtest
