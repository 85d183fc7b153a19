// The step loop driven through a substitute table: titles, vectors, shut functions, results,
// progress and the operator's stop before a step.
#include <gtest/gtest.h>

#include "qorv_chain_driver.h"
#include "qorv_enviroment.h"
#include "qorvex_test_support.h"

namespace {

struct Call {
    std::string mWhat;
    std::vector<std::string> mArgv;
};
std::vector<Call> gCalls;
int gResultOfStep2 = 0;

std::vector<std::string> record(int theArgc, char** theArgv)
{
    std::vector<std::string> v;
    for (int i = 0; i < theArgc; ++i) v.emplace_back(theArgv[i]);
    return v;
}

int run(int argc, char** argv)
{
    gCalls.push_back({"run", record(argc, argv)});
    // The working file shows the title of the step while it runs.
    gCalls.back().mArgv.push_back(qtest::readLines(gWorkingFile).at(1));
    return gCalls.back().mArgv[0] == " range compression" ? gResultOfStep2 : 0;
}
int shut(int argc, char** argv)
{
    gCalls.push_back({"shut", record(argc, argv)});
    return 1;
}

const CStepRow gTable[CQORV_STEP_NBR] = {
    {"Processing parameters construction", run, shut}, {"SAR IQ raw data azimuth spectrum", run, shut},
    {"range compression", run, shut},                  {"autofocus", run, shut},
    {"doppler ambiguity", run, shut},                  {"SAR azimuth omega/k processor", run, shut},
    {"multi look", run, shut},                         {"multi look to tiff conversion", run, shut},
    {"slc to tiff conversion", run, shut},
};

class StepLoop : public ::testing::Test {
protected:
    void SetUp() override
    {
        gCalls.clear();
        gResultOfStep2 = 0;
    }
    qtest::InProcessEnvironment mEnv;
};

TEST_F(StepLoop, EachStepGetsItsTitleAndVectorAndShutRunsWhenAsked)
{
    auto aArgs = qtest::DriverSandbox::defaultArguments("raw", "x_slc");
    aArgs[7] = "OK";
    CChainRun aRun(aArgs, {"raw"});
    EXPECT_EQ(aRun.runStepList(gTable, {0, 2, 5}), 0);
    ASSERT_EQ(gCalls.size(), 6u);
    EXPECT_EQ(gCalls[0].mArgv, (std::vector<std::string>{" Processing parameters construction", "x_par", "raw",
                                                          " Processing parameters construction"}));
    EXPECT_EQ(gCalls[1].mWhat, "shut");
    EXPECT_EQ(gCalls[1].mArgv[1], "x_par");
    EXPECT_EQ(gCalls[4].mArgv[0], " SAR azimuth omega/k processor");
    const std::string aTrace = mEnv.trace();
    EXPECT_NE(aTrace.find("\nStep (1) range compression"), std::string::npos);
    EXPECT_NE(aTrace.find("\naArgv[2] = x_rc"), std::string::npos);
    EXPECT_NE(aTrace.find("DURATION [ range compression]  (s) = "), std::string::npos);
    EXPECT_NE(aTrace.find(" range compression  END "), std::string::npos);
}

TEST_F(StepLoop, ANonZeroResultEndsTheLoopWithoutItsShutFunction)
{
    auto aArgs = qtest::DriverSandbox::defaultArguments("raw", "x_slc");
    aArgs[7] = "OK";
    gResultOfStep2 = 7;
    CChainRun aRun(aArgs, {"raw"});
    EXPECT_EQ(aRun.runStepList(gTable, {0, 2, 5}), 7);
    ASSERT_EQ(gCalls.size(), 3u);  // run 0, shut 0, run 2
    EXPECT_EQ(gCalls.back().mArgv[0], " range compression");

    // Without argument 7 no shut function runs.
    gCalls.clear();
    gResultOfStep2 = 0;
    CChainRun aKeep(qtest::DriverSandbox::defaultArguments("raw", "x_slc"), {"raw"});
    aKeep.runStepList(gTable, {0, 2});
    EXPECT_EQ(gCalls.size(), 2u);
}

TEST_F(StepLoop, AStopWrittenBeforeAStepEndsTheRun)
{
    CChainRun aRun(qtest::DriverSandbox::defaultArguments("raw", "x_slc"), {"raw"});
    qtest::writeFile(gWorkingFile, "101\nstop\n");
    EXPECT_QORV_FAILURE(aRun.runStepList(gTable, {0}), 326400);
    EXPECT_TRUE(gCalls.empty());
}

}  // namespace
