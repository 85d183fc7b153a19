// Progress through the working file and the operator's stop.
#include <cerrno>

#include <gtest/gtest.h>

#include "qorv_enviroment.h"
#include "qorv_progress.h"
#include "qorvex_test_support.h"

namespace {

TEST(Progress, PublishesPercentAndTitleAndKeepsTheOldTitleForNull)
{
    qtest::InProcessEnvironment aEnv;
    qtest::writeFile(gWorkingFile + "_batch_ok", "");
    EXPECT_TRUE(getAndSetPerc(-1, 0, " range compression"));
    EXPECT_EQ(qtest::readLines(gWorkingFile), (std::vector<std::string>{"0", " range compression"}));
    EXPECT_FALSE(std::filesystem::exists(gWorkingFile + "_batch_ok"));
    EXPECT_TRUE(getAndSetPerc(0, 42, nullptr));
    EXPECT_EQ(qtest::readLines(gWorkingFile), (std::vector<std::string>{"42", " range compression"}));
    // 100 and above, and an unchanged value, do nothing.
    EXPECT_TRUE(getAndSetPerc(42, 100, "x"));
    EXPECT_TRUE(getAndSetPerc(42, 42, "x"));
    EXPECT_EQ(qtest::readLines(gWorkingFile)[0], "42");
}

TEST(Progress, AboveHundredIsTheOperatorStopAndHundredIsNot)
{
    qtest::InProcessEnvironment aEnv;
    qtest::writeFile(gWorkingFile, "100\n title\n");
    EXPECT_TRUE(getAndSetPerc(1, 2, nullptr));
    EXPECT_EQ(qtest::readLines(gWorkingFile)[0], "2");
    qtest::writeFile(gWorkingFile, "101\n title\n");
    EXPECT_QORV_FAILURE(getAndSetPerc(2, 3, nullptr), 326400);
    EXPECT_EQ(qtest::readLines(gWorkingFile)[0], "-1");
}

TEST(Progress, ADeletedWorkingFileIsCreatedAnew)
{
    qtest::InProcessEnvironment aEnv;
    std::filesystem::remove(gWorkingFile);
    EXPECT_TRUE(getAndSetPerc(3, 4, nullptr));
    EXPECT_EQ(qtest::readLines(gWorkingFile), (std::vector<std::string>{"4", ""}));
    EXPECT_NE(aEnv.trace().find("] getAndSetPerc - Not found the file : " + gWorkingFile), std::string::npos);
}

// A working file that cannot be written at all (here a directory in its place) is given up at the
// first try, without the pauses kept for a file that the calling program holds for a moment.
TEST(Progress, AWorkingFileThatCannotBeWrittenIsGivenUpAtOnce)
{
    qtest::InProcessEnvironment aEnv;
    std::filesystem::remove(gWorkingFile);
    std::filesystem::create_directory(gWorkingFile);
    EXPECT_TRUE(getAndSetPerc(5, 6, "title"));
    EXPECT_NE(aEnv.trace().find("0 File " + gWorkingFile + " attempt open : "), std::string::npos);
    EXPECT_EQ(aEnv.trace().find("1 File " + gWorkingFile + " attempt open : "), std::string::npos);
    std::filesystem::remove(gWorkingFile);
}

}  // namespace
