// String helpers, the text line reader and the scalar helpers.
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>

#include <unistd.h>

#include "qorv_generic_utility.h"
#include "qorvex_test_support.h"

namespace {

std::string own(char* p)
{
    QorvString aOwner(p);
    return p ? std::string(p) : std::string("<null>");
}

TEST(StringHelpers, CopyConcatenateAndJoinCutAtCarriageReturnAndPassNullThrough)
{
    EXPECT_EQ(own(fqorvStrDup("abc\rdef")), "abc");
    EXPECT_EQ(own(fqorvStrDup(nullptr)), "<null>");
    EXPECT_EQ(own(fqorvStrCat("x", "_rc")), "x_rc");
    EXPECT_EQ(own(fqorvStrCat("x\r", "_rc")), "x");
    EXPECT_EQ(own(fqorvStrCat(nullptr, "_rc")), "<null>");
    EXPECT_EQ(own(fqorvStrCatFree(fqorvStrDup("a"), "b")), "ab");
    // The Doppler ambiguity's look files stand with a doubled underscore behind the rc name.
    EXPECT_EQ(own(fqorvJoin("x_rc", "_amb1_mli")), "x_rc__amb1_mli");
    EXPECT_EQ(own(fqorvFormat("%s-%03d", "a", 7)), "a-007");
}

TEST(StringHelpers, EndsWithNeedsALongerNameAndIgnoresCaseSecond)
{
    EXPECT_TRUE(fqorvEndsWith("a_hdr", "_HDR"));
    EXPECT_TRUE(fqorvEndsWith("scene_foc.list", "_foc.list"));
    EXPECT_FALSE(fqorvEndsWith("_hdr", "_hdr"));
    EXPECT_FALSE(fqorvEndsWith("a_hd", "_hdr"));
    EXPECT_FALSE(fqorvEndsWith(nullptr, "_hdr"));

    char aName[] = "x_SLC";
    EXPECT_TRUE(fqorvCutSuffix(aName, "_slc"));
    EXPECT_STREQ(aName, "x");
    char aShort[] = "_slc";
    EXPECT_FALSE(fqorvCutSuffix(aShort, "_slc"));
    EXPECT_EQ(fqorvCutSuffix(std::string("x_pwr"), "_slc"), "x_pwr");
}

TEST(StringHelpers, FileExistsRefusesNotOkAndEmptyNames)
{
    qtest::TempDir aDir;
    const auto aFile = aDir / "a_NotOK_b";
    qtest::writeFile(aFile, "x");
    const auto aPlain = aDir / "plain";
    qtest::writeFile(aPlain, "x");
    EXPECT_FALSE(fqorvFileExists(aFile.c_str()));
    EXPECT_TRUE(fqorvFileExists(aPlain.c_str()));
    EXPECT_FALSE(fqorvFileExists(""));
    EXPECT_FALSE(fqorvFileExists(static_cast<const char*>(nullptr)));
    EXPECT_FALSE(fqorvFileExists((aDir / "missing").c_str()));
}

TEST(TextLines, TrimsBlanksOnlyStopsAtHashAndEndsLinesAtCarriageReturn)
{
    qtest::TempDir aDir;
    const auto aPath = aDir / "args";
    qtest::writeFile(aPath, "first\n  two  \n\tthree\t\nfour\rtail\n   \n#stop\nafter\n");
    std::vector<std::string> aLines;
    ASSERT_TRUE(fqorvReadTextLines(aPath.c_str(), aLines));
    EXPECT_EQ(aLines, (std::vector<std::string>{"first", "two", "\tthree\t", "four", ""}));
    EXPECT_FALSE(fqorvReadTextLines((aDir / "none").c_str(), aLines));

    // Bounded: a NUL byte or a line over 10000 characters ends the reading with no lines; what
    // stands after the "#" line is never read.
    qtest::writeFile(aPath, "a\n" + std::string("b\0c", 3) + "\n");
    EXPECT_EQ(fqorvReadTextFile(aPath.c_str(), aLines), CQorvTextRead::NulByte);
    EXPECT_TRUE(aLines.empty());
    qtest::writeFile(aPath, "a\n" + std::string(10000, 'x') + "\n#\n" + std::string(20000, '\0'));
    EXPECT_EQ(fqorvReadTextFile(aPath.c_str(), aLines), CQorvTextRead::Ok);
    EXPECT_EQ(aLines.size(), 2u);
    qtest::writeFile(aPath, "a\n" + std::string(10001, 'x'));
    EXPECT_EQ(fqorvReadTextFile(aPath.c_str(), aLines), CQorvTextRead::LineTooLong);
}

// A whole text goes in place by a rename: a write that fails leaves the old file and no temporary.
TEST(TextLines, AFailedAtomicWriteLeavesTheOldFile)
{
    qtest::TempDir aDir;
    const auto aPath = aDir / "result_error";
    ASSERT_TRUE(fqorvWriteTextAtomically(aPath.string(), "old\n"));
    std::filesystem::create_directory(aPath.string() + ".tmp" + std::to_string(static_cast<long>(::getpid())));
    EXPECT_FALSE(fqorvWriteTextAtomically(aPath.string(), "new\n"));
    EXPECT_EQ(qtest::readFile(aPath), "old\n");
    EXPECT_FALSE(fqorvWriteTextAtomically((aDir / "no_dir" / "x").string(), "new\n"));
}

TEST(Scalars, NintLargestPowerAndNullComparison)
{
    using namespace NQORV_UTILITY;
    EXPECT_EQ(nint(2.5), 3);
    EXPECT_EQ(nint(-2.5), -3);
    EXPECT_EQ(nint(-0.4), 0);
    EXPECT_EQ(largestPowerOfTwo(5616), 4096);
    EXPECT_EQ(largestPowerOfTwo(4096), 4096);
    EXPECT_EQ(largestPowerOfTwo(1), 1);
    EXPECT_TRUE(isNullValue(std::nan(""), std::nan("")));
    EXPECT_FALSE(isNullValue(std::nan(""), 0.0));
    EXPECT_TRUE(isNullValue(-9999.0, -9999.0));
    EXPECT_TRUE(isNullValue(0.0, 1e-39));
    EXPECT_FALSE(isNullValue(0.0, 1e-37));
}

}  // namespace
