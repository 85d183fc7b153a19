// The header chain of a list of products, as the driver applies it around steps 2 and 5: the first
// product's estimates rule every product, each product keeps its channel.
#include <gtest/gtest.h>

#include <memory>

#include "chain_fixtures.h"
#include "qorv_chain_driver.h"
#include "qorv_description_section.h"
#include "qorv_proc_param.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

std::unique_ptr<CDescriptionHeader> readFull(const fs::path& thePath)
{
    auto aHeader = CDescriptionHeader::makeFull();
    EXPECT_TRUE(aHeader->read(thePath.c_str(), true)) << thePath;
    return aHeader;
}

/// A raw product with its own channel, and its parameter file made by step 0.
void makeProduct(const fs::path& theDir, const std::string& theName, const char* theChannel, double theVelocity)
{
    const fs::path aRaw = theDir / (theName + "_raw");
    qtest::writeSmallRawProduct(aRaw);
    auto aHeader = readFull(aRaw.string() + "_hdr");
    (*aHeader)["ChannelInfo.Description"].setValue(0, theChannel);
    auto& aVelocity = (*aHeader)["Processing.ProcessingVelocity"];
    aVelocity.setValue(0, theVelocity);
    ASSERT_TRUE(aHeader->write((aRaw.string() + "_hdr").c_str(), true, false));
    std::string aTitle = " Processing parameters construction", aPar = (theDir / theName).string() + "_par",
                aInput = aRaw.string();
    char* aArgv[] = {aTitle.data(), aPar.data(), aInput.data(), nullptr};
    ASSERT_EQ(qorv_proc_param(3, aArgv), 0);
}

TEST(HeaderChainOfAList, LaterProductsTakeTheFirstProductsEstimatesAndKeepTheirChannel)
{
    qtest::InProcessEnvironment aEnv;
    const fs::path aDir = aEnv.work();
    makeProduct(aDir, "a", "VV", 7100.0);
    makeProduct(aDir, "b", "HH", 7000.0);
    // The first product's range compressed header, with an estimate of its own.
    auto aRc = readFull((aDir / "a_raw").string() + "_hdr");
    (*aRc)["Processing.DopplerEstimatedFlag"].setValue("OK");
    ASSERT_TRUE(aRc->write((aDir / "a_rc").c_str(), true, false));

    auto aArgs = qtest::DriverSandbox::defaultArguments(aDir / "scenes_foc.list", "unused");
    CChainRun aRun(aArgs, {(aDir / "a_raw").string(), (aDir / "b_raw").string()});
    aRun.stepArguments(0);
    aRun.stepArguments(5);  // the reference copy of the first rc header; the index moves on
    EXPECT_TRUE(fs::exists(aDir / "a_ref_rc.sml"));
    EXPECT_EQ(aRun.fileIndex(), 1);

    EXPECT_EQ(aRun.stepArguments(0)[1], (aDir / "b_raw").string());
    aRun.stepArguments(2);  // b's raw header and parameter file inherit a's
    auto aRawB = readFull((aDir / "b_raw").string() + "_hdr");
    EXPECT_STREQ((*aRawB)["ChannelInfo.Description"].getString(0), "HH");
    EXPECT_DOUBLE_EQ((*aRawB)["Processing.ProcessingVelocity"].getDouble(0), 7100.0);
    auto aParB = readFull((aDir / "b_par").string());
    EXPECT_STREQ((*aParB)["sar_processing.Channel"].getString(), "HH");
    EXPECT_DOUBLE_EQ((*aParB)["sar_processing.Velocity"].getDouble(), 7100.0);

    // Before focusing b: its rc header becomes the reference's.
    auto aRcB = readFull((aDir / "b_raw").string() + "_hdr");
    ASSERT_TRUE(aRcB->write((aDir / "b_rc").c_str(), true, false));
    aRun.stepArguments(5);
    auto aFinal = readFull((aDir / "b_rc").string() + "_hdr");
    EXPECT_STREQ((*aFinal)["Processing.DopplerEstimatedFlag"].getString(), "OK");
}

TEST(HeaderChainOfAList, AMissingHeaderIsAMissingFile)
{
    qtest::InProcessEnvironment aEnv;
    const fs::path aDir = aEnv.work();
    makeProduct(aDir, "a", "VV", 7100.0);
    auto aArgs = qtest::DriverSandbox::defaultArguments(aDir / "scenes_foc.list", "unused");
    CChainRun aRun(aArgs, {(aDir / "a_raw").string(), (aDir / "b_raw").string()});
    aRun.stepArguments(0);
    EXPECT_QORV_FAILURE(aRun.stepArguments(5), 261122);  // no a_rc header to keep as reference
}

}  // namespace
