// The running order of the steps and the argument vectors built from the product's root.
#include <gtest/gtest.h>

#include "qorv_chain_driver.h"
#include "qorvex_test_support.h"

namespace {

using Steps = std::vector<int>;

Steps list(bool focus, bool ml, bool par, bool azsp, bool rc, bool amb, bool af, bool tiff, int files)
{
    return fdfBuildStepList(focus, ml, par, azsp, rc, amb, af, tiff, files);
}

TEST(StepList, FirstProductCarriesAllEstimationStepsInTheChainOrder)
{
    EXPECT_EQ(list(true, true, true, true, true, true, true, true, 1), (Steps{0, 1, 2, 4, 3, 3, 3, 5, 6, 7}));
    EXPECT_EQ(list(true, false, true, true, true, true, true, true, 1), (Steps{0, 1, 2, 4, 3, 3, 3, 5, 8}));
    EXPECT_EQ(list(true, false, true, false, true, false, false, false, 1), (Steps{0, 2, 5}));
    // Focusing always ends in step 5, whatever is skipped before it.
    EXPECT_EQ(list(true, false, false, false, false, false, false, false, 1), (Steps{5}));
    // Only multi-looking: step 6 takes the input itself.
    EXPECT_EQ(list(false, true, true, true, true, true, true, true, 1), (Steps{0, 6, 7}));
    EXPECT_EQ(list(false, false, true, true, true, true, true, true, 1), (Steps{0, 8}));
}

TEST(StepList, FurtherProductsOfAListReuseTheFirstProductsEstimates)
{
    EXPECT_EQ(list(true, true, true, true, true, true, true, true, 2),
              (Steps{0, 1, 2, 4, 3, 3, 3, 5, 6, 7, 0, 2, 5, 6, 7}));
    // Step 0 is forced for later files; step 8 never runs for them.
    EXPECT_EQ(list(true, false, false, true, false, false, true, true, 3), (Steps{1, 3, 3, 3, 5, 8, 0, 5, 0, 5}));
    // The fixed-size form has room for the longest sequence.
    int aSteps[10 + 4 * 5];
    EXPECT_EQ(fdfBuildStepList(true, true, true, true, true, true, true, true, 5, aSteps), 10 + 4 * 5);
}

std::vector<std::string> arguments(const std::string& theInput, const std::string& theRoot)
{
    return qtest::DriverSandbox::defaultArguments(theInput, theRoot);
}

TEST(StepArguments, SingleProductNamesEveryFileFromTheOutputRoot)
{
    auto aArgs = arguments("/d/scene_raw", "/d/x_slc");
    aArgs[7] = "OK";
    aArgs[12] = "NotOK";
    aArgs.push_back("3");
    CChainRun aRun(aArgs, {"/d/scene_raw"});
    aRun.setDopPolDeg("3");
    using V = std::vector<std::string>;
    EXPECT_EQ(aRun.stepArguments(0), (V{"/d/x_par", "/d/scene_raw"}));
    EXPECT_EQ(aRun.stepArguments(1), (V{"/d/scene_raw", "/d/x_par", "/d/x_azsp", "8", "3"}));
    EXPECT_EQ(aRun.stepArguments(2), (V{"/d/scene_raw", "/d/x_rc", "/d/x_par"}));
    EXPECT_EQ(aRun.stepArguments(4), (V{"/d/x_rc", "/d/x_par"}));
    EXPECT_EQ(aRun.stepArguments(3), (V{"/d/x_rc", "/d/x_par"}));
    EXPECT_EQ(aRun.stepArguments(5), (V{"/d/x_rc", "/d/x_slc", "/d/x_par", "1", "1", "8192", "0", "0", "-1", "-1"}));
    EXPECT_EQ(aRun.stepArguments(6), (V{"/d/x_slc", "/d/x_pwr", "/d/x_par", "1", "5", "0", "OK", "NotOK", "NotOK"}));
    EXPECT_EQ(aRun.stepArguments(7), (V{"/d/x_pwr", "/d/x_pwr.tif", "0.333"}));
    EXPECT_EQ(aRun.stepArguments(8), (V{"/d/x_slc", "/d/x_slc.tif", "0.333", "1", "1"}));
    EXPECT_EQ(aRun.keepRoot(), "/d/x");
}

TEST(StepArguments, RootSuffixesAndTheLastArgumentOfFocusing)
{
    auto aArgs = arguments("in", "out_pwr");
    aArgs[1] = "NotOK";  // no focusing: "_pwr" is cut, and step 6 reads the input itself
    aArgs[12] = "42";
    CChainRun aRun(aArgs, {"in"});
    EXPECT_EQ(aRun.stepArguments(0)[0], "out_par");
    EXPECT_EQ(aRun.stepArguments(6)[0], "in");
    EXPECT_EQ(aRun.stepArguments(5).back(), "42");

    auto aOther = arguments("in", "plain");  // neither suffix: used as it stands
    CChainRun aPlain(aOther, {"in"});
    EXPECT_EQ(aPlain.stepArguments(0)[0], "plain_par");
    // A run that skips step 0 still names its files from the output root.
    CChainRun aSkipped(aOther, {"in"});
    EXPECT_EQ(aSkipped.stepArguments(2)[1], "plain_rc");
}

TEST(StepArguments, ListRootsComeFromTheFileNamesAndTheIndexMovesAtFocusing)
{
    auto aArgs = arguments("scenes_foc.list", "ignored");
    aArgs[1] = "NotOK";
    CChainRun aNoFocus(aArgs, {"/d/a_raw", "/d/b_raw"});
    aNoFocus.stepArguments(0);
    EXPECT_EQ(aNoFocus.root(), "/d/a");
    EXPECT_EQ(aNoFocus.refRoot(), "/d/a_ref");
    // Without focusing the index never moves: every later product is the first file again.
    aNoFocus.stepArguments(6);
    aNoFocus.stepArguments(0);
    EXPECT_EQ(aNoFocus.currentInput(), "/d/a_raw");

    // A list of one line names its products from that line, not from argument 2.
    CChainRun aOne(arguments("one_foc.list", "ignored_slc"), {"/d/c_raw"});
    aOne.stepArguments(0);
    EXPECT_EQ(aOne.root(), "/d/c");
    EXPECT_EQ(aOne.stepList(), CChainRun(arguments("/d/c_raw", "x_slc"), {"/d/c_raw"}).stepList());
}

}  // namespace
