// Failure ids, catalogues, result files and the throw path before the reporting mode is set.
#include <gtest/gtest.h>

#include <cstring>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorvex_test_support.h"

namespace {

TEST(FailureIds, PrimaryAndSecondaryCodesAndExitStatus)
{
    EXPECT_EQ(fqorvPEC(456962), 7);
    EXPECT_EQ(fqorvSEC(456962), 1);
    EXPECT_EQ(fqorvPEC(326400), 5);
    EXPECT_EQ(fqorvSEC(326400), -1);
    EXPECT_EQ(fqorvSEC(261121), 0);
    // Ids that are multiples of 256 would read as success in 8 bits: the status is the PEC.
    for (int aId : {130560, 261120, 326400, 913920, 261122, 848646}) {
        EXPECT_NE(fqorvExitStatus(aId), 0) << aId;
        EXPECT_EQ(fqorvExitStatus(aId), fqorvPEC(aId)) << aId;
    }
    EXPECT_EQ(fqorvExitStatus(0), 0);
    EXPECT_EQ(fqorvExitStatus(1), 255);       // a step's non-zero result that is no id
    EXPECT_EQ(fqorvExitStatus(-5), 255);
    EXPECT_EQ(fqorvExitStatus(65280), 1);     // the run with warnings
    EXPECT_EQ(fqorvExitStatus(255 * 65280), 255);
}

class CatalogTest : public ::testing::Test {
protected:
    CErrorCatalog mErrors;
    char mPrimary[2048] = {};
    char mSecondary[2048] = {};
};

TEST_F(CatalogTest, DeliveredCataloguesHaveATextForEveryIdOfTheTable)
{
    ASSERT_TRUE(mErrors.read((qtest::sourceShareDir() / "des" / "qorv_errors_catalog.des").c_str()));
    for (int aId : {130560, 195840, 261120, 261121, 261122, 261123, 261124, 261125, 261126, 326400, 456960,
                    456961, 456962, 456965, 522240, 587520, 652802, 652803, 652804, 652807, 783360, 783361, 848640,
                    848641, 848642, 848644, 848645, 848646, 848647, 913920, 913921, 913922}) {
        mErrors.getErrorText(aId, mPrimary, mSecondary);
        EXPECT_STRNE(mPrimary, "GENERIC ERROR WRONG CODE") << aId;
        if (fqorvSEC(aId) >= 0) {
            EXPECT_GT(std::strlen(mSecondary), 0u) << aId;
            EXPECT_STRNE(mSecondary, "GENERIC ERROR WRONG CODE") << aId;
        } else {
            EXPECT_STREQ(mSecondary, "") << aId;
        }
    }
    CErrorCatalog aWarnings;
    ASSERT_TRUE(aWarnings.read((qtest::sourceShareDir() / "des" / "qorv_warnings_catalog.des").c_str()));
    for (int aId : {65281, 65283, 65284, 130561}) {
        aWarnings.getErrorText(aId, mPrimary, mSecondary);
        EXPECT_GT(std::strlen(mSecondary), 0u) << aId;
    }
}

TEST_F(CatalogTest, FormatKeysBlocksInAnyOrderAndWrongCodes)
{
    qtest::TempDir aDir;
    const auto aPath = aDir / "cat.des";
    qtest::writeFile(aPath,
                     "2\nunused\nKA, first\nKB\tsecond\nunused\nPRIMARY A\nPRIMARY B\n"
                     "[ErrorCodeInfo_KB]\n2\nb zero\nb one\n[ErrorCodeInfo_KA]\n1\na zero\n#\n[ErrorCodeInfo_KX]\n");
    ASSERT_TRUE(mErrors.read(aPath.c_str()));
    EXPECT_EQ(mErrors.mPECNbr, 2);
    mErrors.getErrorText(65280 + 2, mPrimary, mSecondary);
    EXPECT_STREQ(mPrimary, "PRIMARY B");
    EXPECT_STREQ(mSecondary, "b one");
    mErrors.getErrorText(1, mPrimary, mSecondary);
    EXPECT_STREQ(mSecondary, "a zero");
    mErrors.getErrorText(65280 + 3, mPrimary, mSecondary);  // SEC 2 beyond the block
    EXPECT_STREQ(mSecondary, "GENERIC ERROR WRONG CODE");
    mErrors.getPrimaryText(7 * 65280 + 2, mPrimary);
    EXPECT_STREQ(mPrimary, "GENERIC ERROR WRONG CODE  :  456962 [PEC 7]");
    mErrors.getSecondaryText(65280 + 3, mSecondary);
    EXPECT_STREQ(mSecondary, "GENERIC ERROR WRONG CODE  :  65283 [1 : 2]");

    CErrorCatalog aEmpty;
    aEmpty.getErrorText(456962, mPrimary, mSecondary);
    EXPECT_STREQ(mPrimary, "AN ERROR OCCUR DURING Qorvex INIT");
    EXPECT_STREQ(mSecondary, "");
    aEmpty.getPrimaryText(456962, mPrimary);
    EXPECT_STREQ(mPrimary, "AN ERROR OCCUR DURING Qorvex INIT  : [456962]");
}

TEST(ResultFiles, BlockLayoutLineBreakingAndHeaderNames)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aLong(200, 'p');
    writeResultFiles(CQORV_ERR_MISSING_FILE, aLong.c_str(), "x_hdr", static_cast<const char*>(nullptr));
    const auto aWorking = qtest::readLines(gWorkingFile);
    ASSERT_GE(aWorking.size(), 8u);
    EXPECT_EQ(aWorking[0], "-1");
    EXPECT_EQ(aWorking[1], "NO Hostview execution");  // the title line is kept
    EXPECT_EQ(aWorking[2], "FILE ACCESS ERROR");
    EXPECT_EQ(aWorking[3], "A needed input file is missing [EC : 261122]");
    // 200 characters: three lines of 48, cut at 144 in all; the second parameter finds no room.
    EXPECT_EQ(aWorking[4], std::string(48, 'p'));
    EXPECT_EQ(aWorking[5], std::string(48, 'p'));
    EXPECT_EQ(aWorking[6], std::string(48, 'p'));
    EXPECT_EQ(aWorking[7], "");
    EXPECT_EQ(aWorking[8], std::string(66, ' '));
    const auto aError = qtest::readLines(gWorkingFile + "_error");
    ASSERT_GE(aError.size(), 3u);
    EXPECT_EQ(aError[0], "-1");
    EXPECT_EQ(aError[1], "FILE ACCESS ERROR");

    // A header name is shown as the file that exists, for the file failures only.
    writeResultFiles(CQORV_ERR_MISSING_FILE, "x_hdr", static_cast<const char*>(nullptr));
    EXPECT_EQ(qtest::readLines(gWorkingFile)[4], "x.sml");
    writeResultFiles(CQORV_ERR_WRONG_REQUEST, "x_hdr", static_cast<const char*>(nullptr));
    EXPECT_EQ(qtest::readLines(gWorkingFile)[4], "x_hdr");
    // Short parameters are one line each, at most three lines.
    writeResultFiles(CQORV_ERR_WRONG_REQUEST, "a", "b", "c", "d", static_cast<const char*>(nullptr));
    const auto aShort = qtest::readLines(gWorkingFile);
    EXPECT_EQ(aShort[4], "a");
    EXPECT_EQ(aShort[6], "c");
    EXPECT_EQ(aShort[7], "");
    // A run with warnings shows -2.
    writeResultFiles(CQORV_WARNINGS_PSEUDO_ID, "", static_cast<const char*>(nullptr));
    EXPECT_EQ(qtest::readLines(gWorkingFile)[0], "-2");
}

TEST(ResultFiles, WorkingFileThatCannotBeOpenedGivesTheTmpCompanion)
{
    qtest::InProcessEnvironment aEnv;
    std::remove(gWorkingFile.c_str());
    std::filesystem::create_directory(gWorkingFile);  // a directory can't be opened for writing
    writeResultFiles(CQORV_ERR_MISSING_FILE, "input", static_cast<const char*>(nullptr));
    const auto aTmp = qtest::readLines(gWorkingFile + "_tmp");
    ASSERT_GE(aTmp.size(), 3u);
    EXPECT_EQ(aTmp[0], "FILE ACCESS ERROR");  // block B without its first line
    EXPECT_EQ(aTmp[2], "input");
    std::filesystem::remove(gWorkingFile);
}

TEST(Fatal, ReportsThroughTraceLogAndResultFilesThenEnds)
{
    qtest::InProcessEnvironment aEnv;
    fdfSetTitle("range compression");
    EXPECT_QORV_FAILURE(QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "args.txt"), 456962);
    EXPECT_NE(aEnv.trace().find("\nERROR : NUMERICAL OR ARGUMENT ERROR [Wrong number of arguments] (args.txt) \n  range compression"),
              std::string::npos);
    EXPECT_NE(aEnv.log().find("[ERROR ID : 456962]\n  NUMERICAL OR ARGUMENT ERROR [Wrong number of arguments]\n  args.txt"),
              std::string::npos);
    EXPECT_EQ(qtest::readLines(gWorkingFile)[0], "-1");
    // The trace of a failed run is kept under a time-stamped name.
    bool aSaved = false;
    for (const auto& e : std::filesystem::directory_iterator(aEnv.work() / "work"))
        aSaved |= e.path().filename().string().rfind("Process_", 0) == 0;
    EXPECT_TRUE(aSaved);
}

TEST(Fatal, BeforeTheReportingModeIsSetAFailureIsThrown)
{
    const bool aSaved = gReportingMode;
    gReportingMode = false;
    try {
        QORV_FATAL(CQORV_ERR_MISSING_FILE, "early");
        FAIL() << "no exception";
    } catch (const CErrorExceptionManager& e) {
        EXPECT_EQ(e.mId, 261122);
        EXPECT_EQ(e.mPEC, 4);
        EXPECT_EQ(e.mSEC, 1);
        EXPECT_STREQ(e.mParameter, "early");
    }
    gReportingMode = aSaved;
}

}  // namespace
