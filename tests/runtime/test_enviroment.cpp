// Configuration, settings table, title, trace and log of a run brought up in-process.
#include <gtest/gtest.h>

#include <cstring>

#include <cmath>
#include <cstdlib>

#include <unistd.h>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorvex_test_support.h"

namespace {

using qtest::ConfigOptions;
using qtest::InProcessEnvironment;

TEST(Configuration, DirectoriesEndInOneSeparatorAndTheEnvironmentWins)
{
    InProcessEnvironment aEnv;
    EXPECT_EQ(fdfGetSetting(CQORV_KEY_FILES_DIR), (qtest::sourceShareDir() / "keys").string() + "/");
    EXPECT_EQ(fdfGetSetting(CQORV_WORKING_DIR), (aEnv.work() / "work").string() + "/");
    EXPECT_EQ(fdfGetSetting(CQORV_BATCH_DIR), fdfGetSetting(CQORV_WORKING_DIR));
    EXPECT_EQ(gWorkingFile, fdfGetSetting(CQORV_WORKING_DIR) + "Process.working");
    EXPECT_EQ(gDummyDouble, -9999.0);
    EXPECT_TRUE(gTraceActive);
    EXPECT_EQ(qtest::readLines(gWorkingFile), (std::vector<std::string>{"0", "NO Hostview execution"}));

    // A working directory in the environment, without a trailing separator, gets one; a
    // configuration value ending in a backslash is taken as a directory too.
    const auto aOther = aEnv.work() / "other";
    std::filesystem::create_directories(aOther);
    std::string aConfig = qtest::readFile(aEnv.work() / "etc" / "Qorvex_configuration.ini");
    const std::size_t aFirstEnd = aConfig.find('\n');
    aConfig = aConfig.substr(0, aFirstEnd - 1) + "\\" + aConfig.substr(aFirstEnd);
    qtest::writeFile(aEnv.work() / "etc" / "Qorvex_configuration.ini", aConfig);
    ::setenv("QORVEX_WORKING_DIR", aOther.c_str(), 1);
    fdfInit(true, CQORV_VERSION_TEXT, true);
    fdfRestoreStandardStreams();
    EXPECT_EQ(fdfGetSetting(CQORV_WORKING_DIR), aOther.string() + "/");
    EXPECT_EQ(fdfGetSetting(CQORV_KEY_FILES_DIR), (qtest::sourceShareDir() / "keys").string() + "/");
    EXPECT_TRUE(std::filesystem::exists(aOther / "Process.trace"));
    ::unsetenv("QORVEX_WORKING_DIR");
}

TEST(Configuration, TracingIsComparedOverSixLettersAndNaNMarksNoValue)
{
    ConfigOptions aOptions;
    aOptions.mTracing = "ACTIVE_X";
    aOptions.mDummy = "NaN";
    InProcessEnvironment aEnv(aOptions);
    EXPECT_TRUE(gTraceActive);
    EXPECT_TRUE(std::isnan(gDummyDouble));
    EXPECT_NE(aEnv.trace().find("OpenTrace 1  2\n"), std::string::npos);
    EXPECT_NE(aEnv.trace().find("POOL : 110"), std::string::npos);

    ConfigOptions aOff;
    aOff.mTracing = "ACTIV";
    InProcessEnvironment aQuiet(aOff);
    EXPECT_FALSE(gTraceActive);
    EXPECT_FALSE(std::filesystem::exists(aQuiet.work() / "work" / "Process.trace"));
}

TEST(Configuration, ShortFileAndMissingDirectoryAreFailures)
{
    InProcessEnvironment aEnv;
    const auto aIni = aEnv.work() / "etc" / "Qorvex_configuration.ini";
    auto aLines = qtest::readLines(aIni);
    std::string aShort;
    for (int i = 0; i < 13; ++i) aShort += aLines[static_cast<std::size_t>(i)] + "\n";
    qtest::writeFile(aIni, aShort);
    EXPECT_QORV_FAILURE(aEnv.reinit(), 783360);
    std::filesystem::remove(aIni);
    EXPECT_QORV_FAILURE(aEnv.reinit(), 261122);
    ::unsetenv("QORVEX_INIT_DIR");
    ::unsetenv("windir");
    EXPECT_QORV_FAILURE(fdfInit(true, CQORV_VERSION_TEXT, true), 783360);
}

TEST(Configuration, MissingCatalogueIsAMissingFile)
{
    qtest::TempDir aDes;
    ConfigOptions aOptions;
    aOptions.mDesDir = aDes.path();
    EXPECT_QORV_FAILURE(InProcessEnvironment aEnv(aOptions), 261122);
}

TEST(Settings, ReplaceAppendAndMissingKey)
{
    InProcessEnvironment aEnv;
    fdfSetEnvVar("one", "MY_KEY");
    fdfSetEnvVar("two", "MY_KEY");
    char aBuffer[64] = "untouched";
    EXPECT_EQ(fdfGetEnvVar(aBuffer, "MY_KEY", sizeof aBuffer), 0);
    EXPECT_STREQ(aBuffer, "two");
    std::strcpy(aBuffer, "untouched");
    EXPECT_EQ(fdfGetEnvVar(aBuffer, "MY_KE", sizeof aBuffer), -11);
    EXPECT_STREQ(aBuffer, "untouched");
    for (int i = 0; i < 120; ++i) fdfSetEnvVar("v", ("K" + std::to_string(i)).c_str());
    EXPECT_EQ(fdfGetSetting("K119"), "v");
}

TEST(Title, OneLeadingBlankLineFeedsBecomeBlanksAndEightyCharactersAtMost)
{
    fdfSetTitle("range\ncompression");
    EXPECT_STREQ(fdfGetTitle(), " range compression");
    fdfSetTitle(std::string(100, 't').c_str());
    EXPECT_EQ(std::strlen(fdfGetTitle()), 80u);
}

TEST(Banners, StartAndEndBannerGoToLogAndTrace)
{
    InProcessEnvironment aEnv;
    char aA[] = "raw", aB[] = "OK";
    char* aArgv[] = {aA, aB};
    fdfStartBanner(aArgv, 2, "Focussing and multilooking", nullptr);
    fdfEndBanner();
    const std::string aRule(160, '*');
    for (const std::string& aText : {aEnv.log(), aEnv.trace()}) {
        EXPECT_NE(aText.find("\n\n\n" + aRule + "\nSTART : Focussing and multilooking  [ " + CQORV_VERSION_TEXT + " ]\n"),
                  std::string::npos);
        EXPECT_NE(aText.find(" Parameter 0 (raw)\n Parameter 1 (OK)\n\n" + aRule + "\n\n"), std::string::npos);
        EXPECT_NE(aText.find("\n" + aRule + "\nEND : " + CQORV_VERSION_TEXT + "  -  "), std::string::npos);
    }
}

TEST(CloseAll, SuccessRemovesTheWorkingFileAndALogAboveAMillionBytesIsMovedAway)
{
    InProcessEnvironment aEnv;
    const std::string aChunk(20000, 'x');  // the log formats into a buffer of 25000 bytes
    for (int i = 0; i < 51; ++i) fdfLog("%s", aChunk.c_str());
    fdfCloseAll(0, true, true);
    EXPECT_FALSE(std::filesystem::exists(gWorkingFile));
    EXPECT_FALSE(std::filesystem::exists(aEnv.workPath("work/Process.log")));
    bool aMoved = false;
    for (const auto& e : std::filesystem::directory_iterator(aEnv.work() / "work"))
        aMoved |= e.path().filename().string().rfind("Process_", 0) == 0 && std::filesystem::file_size(e.path()) > 1000000;
    EXPECT_TRUE(aMoved);

    // A small log stays, and keeps its end banner and the success text.
    aEnv.reinit();
    fdfCloseAll(0, true, true);
    const std::string aLog = aEnv.log();
    EXPECT_NE(aLog.find("\n\nSUCCESSFUL\n\n"), std::string::npos);
    EXPECT_NE(aLog.find("\nEND : " + std::string(CQORV_VERSION_TEXT)), std::string::npos);
}

TEST(DeferredDeletion, DeletesFlaggedEntriesOnly)
{
    InProcessEnvironment aEnv;
    const auto a = aEnv.workPath("a.tmp"), b = aEnv.workPath("b.tmp");
    qtest::writeFile(a, "a");
    qtest::writeFile(b, "b");
    fdfAddDeleteFile(a.c_str(), true);
    fdfAddDeleteFile(b.c_str(), false);
    fdfDeleteFiles(true);
    EXPECT_FALSE(std::filesystem::exists(a));
    EXPECT_TRUE(std::filesystem::exists(b));
    EXPECT_NE(aEnv.trace().find("NUMBER of file to delete : 2"), std::string::npos);
    EXPECT_NE(aEnv.trace().find("[1] NO deleteFile(" + b.string() + " , false)"), std::string::npos);
}

TEST(DeferredDeletion, AFailingRunLeavesTheHelperProgramToRemoveItsTemporaryFiles)
{
    InProcessEnvironment aEnv;
    const auto aTemporary = aEnv.workPath("block.tmp");
    qtest::writeFile(aTemporary, "temporary");
    fdfAddDeleteFile(aTemporary.c_str(), true);
    EXPECT_QORV_FAILURE(QORV_FATAL(CQORV_ERR_MEMORY, "block"), 522240);
    for (int i = 0; i < 50 && std::filesystem::exists(aTemporary); ++i) usleep(100000);
    EXPECT_FALSE(std::filesystem::exists(aTemporary));
}

}  // namespace
