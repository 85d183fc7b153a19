// The driver program run as a real process: exit status, result files, working file, trace, log.
#include <gtest/gtest.h>

#include <memory>

#include "chain_fixtures.h"
#include "qorv_description_section.h"
#include "qorv_errors.h"
#include "qorvex_test_support.h"

namespace {

using qtest::DriverSandbox;
using qtest::RunResult;

/// Writes a small raw product into the sandbox's data directory.
std::filesystem::path makeRaw(const DriverSandbox& theBox, const std::string& theName,
                              const qtest::SmallRawOptions& theOptions = {})
{
    qtest::InProcessEnvironment aEnv;
    const auto aRaw = theBox.data() / theName;
    qtest::writeSmallRawProduct(aRaw, theOptions);
    return aRaw;
}

/// Reads a header written by a run.
std::unique_ptr<CDescriptionHeader> readHeader(const std::filesystem::path& thePath)
{
    auto aHeader = CDescriptionHeader::makeFull();
    EXPECT_TRUE(aHeader->read(thePath.c_str(), true)) << thePath;
    return aHeader;
}

/// The working file after a failure: -1, the title, the texts, the id in the secondary line.
void expectFailureReported(const DriverSandbox& theBox, const RunResult& theRun, int theId)
{
    EXPECT_EQ(theRun.mExitId, theId) << theRun.mStderr;
    EXPECT_EQ(theRun.mStatus, fqorvExitStatus(theId));
    EXPECT_NE(theRun.mStatus, 0);
    const auto aWorking = qtest::readLines(theBox.workingFile());
    ASSERT_GE(aWorking.size(), 4u);
    EXPECT_EQ(aWorking[0], "-1");
    EXPECT_NE(aWorking[3].find("[EC : " + std::to_string(theId) + "]"), std::string::npos) << aWorking[3];
    EXPECT_EQ(qtest::readLines(theBox.workingFile().string() + "_error").at(0), "-1");
}

TEST(DriverProcess, MissingOrShortArgumentsFile)
{
    DriverSandbox aBox;
    RunResult aRun = aBox.run(aBox.data() / "no_such_args.txt");
    expectFailureReported(aBox, aRun, 261122);
    EXPECT_NE(qtest::readLines(aBox.workingFile())[4].find("no_such_args.txt"), std::string::npos);

    qtest::writeFile(aBox.data() / "one_line.txt", "only a comment line\n");
    expectFailureReported(aBox, aBox.run(aBox.data() / "one_line.txt"), 261122);
}

TEST(DriverProcess, FewerThanNineteenArgumentsAlsoWhenAHashLineCutsThem)
{
    DriverSandbox aBox;
    auto aArgs = DriverSandbox::defaultArguments(aBox.data() / "raw", aBox.data() / "x_slc");
    aArgs.resize(18);
    expectFailureReported(aBox, aBox.run(aBox.writeArguments(aArgs)), 456962);

    auto aCut = DriverSandbox::defaultArguments(aBox.data() / "raw", aBox.data() / "x_slc");
    aCut.insert(aCut.begin() + 10, "# everything from here on is ignored");
    expectFailureReported(aBox, aBox.run(aBox.writeArguments(aCut, "cut.txt")), 456962);
}

TEST(DriverProcess, EnvironmentFailuresKeepTheirIds)
{
    DriverSandbox aBox;
    const auto aArgs = aBox.writeArguments(DriverSandbox::defaultArguments(aBox.data() / "raw", aBox.data() / "x_slc"));
    // No QORVEX_INIT_DIR: the run can't know its working file; the id still reaches the caller.
    RunResult aNoInit = qtest::runProgram(qtest::binaryDir() / "qorvex", {aArgs.string()}, {}, aBox.work());
    EXPECT_EQ(aNoInit.mExitId, 783360);
    EXPECT_EQ(aNoInit.mStatus, fqorvExitStatus(783360));
    // With the working file named in the environment, the result files show it.
    qtest::writeFile(aBox.workingFile(), "0\ncaller\n");
    RunResult aNamed = qtest::runProgram(qtest::binaryDir() / "qorvex", {aArgs.string()},
                                         {{"QORVEX_WORKING_FILE", aBox.workingFile().string()}}, aBox.work());
    EXPECT_EQ(aNamed.mExitId, 783360);
    EXPECT_NE(qtest::readFile(aBox.workingFile().string() + "_error").find("[EC : 783360]"), std::string::npos);

    // A configuration of 13 lines.
    const auto aIni = aBox.etc() / "Qorvex_configuration.ini";
    const std::string aFull = qtest::readFile(aIni);
    qtest::writeFile(aIni, aFull.substr(0, aFull.rfind('\n', aFull.size() - 2) + 1));
    EXPECT_EQ(aBox.run(aArgs).mExitId, 783360);
    // A line over 511 characters is refused, not split into two settings.
    qtest::writeFile(aIni, std::string(600, '/') + aFull.substr(aFull.find('\n')));
    EXPECT_EQ(aBox.run(aArgs).mExitId, 783360);
}

TEST(DriverProcess, MissingCatalogueIsAMissingFile)
{
    qtest::TempDir aDes;
    qtest::ConfigOptions aOptions;
    aOptions.mDesDir = aDes.path();
    DriverSandbox aBox(aOptions);
    qtest::writeFile(aBox.workingFile(), "0\ncaller\n");
    const auto aArgs = aBox.writeArguments(DriverSandbox::defaultArguments(aBox.data() / "raw", aBox.data() / "x_slc"));
    RunResult aRun = aBox.run(aArgs);
    EXPECT_EQ(aRun.mExitId, 261122);
    EXPECT_EQ(qtest::readLines(aBox.workingFile()).at(0), "-1");
    // Without catalogues the texts say so.
    EXPECT_NE(qtest::readFile(aBox.workingFile()).find("AN ERROR OCCUR DURING Qorvex INIT"), std::string::npos);
}

TEST(DriverProcess, MissingInputWithArgumentElevenEndsSuccessfully)
{
    DriverSandbox aBox;
    auto aArgs = DriverSandbox::defaultArguments(aBox.data() / "raw_missing", aBox.data() / "x_slc");
    aArgs[11] = "OK";
    RunResult aRun = aBox.run(aBox.writeArguments(aArgs));
    EXPECT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    EXPECT_EQ(aRun.mExitId, 0);
    EXPECT_NE(aBox.trace().find("SUCCESSFULL"), std::string::npos);
    EXPECT_NE(aBox.log().find("\n\nSUCCESSFULL\n\n\n"), std::string::npos);
    EXPECT_NE(aBox.log().find("\n\nSUCCESSFUL\n\n"), std::string::npos);
    EXPECT_FALSE(std::filesystem::exists(aBox.workingFile()));
    EXPECT_FALSE(std::filesystem::exists(aBox.data() / "x_par.sml"));
}

TEST(DriverProcess, AStopInTheWorkingFileEndsTheRunBeforeTheFirstStep)
{
    DriverSandbox aBox;
    qtest::writeFile(aBox.workingFile(), "101\ncaller\n");
    auto aArgs = DriverSandbox::defaultArguments(makeRaw(aBox, "raw"), aBox.data() / "x_slc");
    aArgs[14] = "OK";
    expectFailureReported(aBox, aBox.run(aBox.writeArguments(aArgs)), 326400);
    EXPECT_EQ(qtest::readLines(aBox.workingFile()).at(1), "caller");  // the caller's title line is kept
}

TEST(DriverProcess, StepZeroMakesTheParameterFileAndTheRunEndsCleanly)
{
    DriverSandbox aBox;
    auto aArgs = DriverSandbox::defaultArguments(makeRaw(aBox, "scene_raw"), aBox.data() / "x_pwr");
    aArgs[1] = "NotOK";  // only step 0 runs; without focusing "_pwr" is cut from the root
    RunResult aRun = aBox.run(aBox.writeArguments(aArgs));
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    EXPECT_EQ(aRun.mExitId, 0);
    EXPECT_FALSE(std::filesystem::exists(aBox.workingFile()));
    qtest::InProcessEnvironment aEnv;
    auto aPar = std::make_unique<CDescriptionHeader>(std::initializer_list<const char*>{"sar_processing"});
    ASSERT_TRUE(aPar->read((aBox.data() / "x_par").c_str(), true));
    EXPECT_DOUBLE_EQ((*aPar)["sar_processing.Velocity"].getDouble(), 7109.5);
    EXPECT_EQ((*aPar)["sar_processing.ProcessedLines"].getInteger(), 40);
    const std::string aTrace = aBox.trace();
    EXPECT_NE(aTrace.find("\nStep (0) Processing parameters construction"), std::string::npos);
    EXPECT_NE(aTrace.find("FOC TOTAL TIME (s): "), std::string::npos);
    EXPECT_NE(aBox.log().find("\n\nSUCCESSFUL\n\n"), std::string::npos);
}

TEST(DriverProcess, PrfExtractionRecordsSegmentsAndKeepsTheOriginalHeaderOnce)
{
    DriverSandbox aBox;
    qtest::SmallRawOptions aOptions;
    aOptions.mChangeLine = 25;
    const auto aRaw = makeRaw(aBox, "changing_raw", aOptions);
    auto aArgs = DriverSandbox::defaultArguments(aRaw, aBox.data() / "x_slc");
    aArgs[1] = "NotOK";
    aArgs[14] = "OK";  // no step at all: the scan alone
    ASSERT_EQ(aBox.run(aBox.writeArguments(aArgs)).mStatus, 0);
    {
        qtest::InProcessEnvironment aEnv;
        auto aHeader = readHeader(aRaw.string() + "_hdr");
        const CDescriptionField& aChanges = (*aHeader)["ChannelInfo.PRFChanges"];
        ASSERT_EQ(aChanges.getNbrOfRows(), 2);
        EXPECT_DOUBLE_EQ(aChanges.getDouble(0, 0), 0.0);
        EXPECT_NEAR(aChanges.getDouble(0, 1), 1.0 / (2822 * 210.94e-9), 1e-6);
        EXPECT_DOUBLE_EQ(aChanges.getDouble(1, 0), 25.0);
        EXPECT_NEAR(aChanges.getDouble(1, 1), 1.0 / (2802 * 210.94e-9), 1e-6);
        // "PRF" takes the extracted value; the original header is kept with that change only.
        EXPECT_DOUBLE_EQ((*aHeader)["ChannelInfo.PRF"].getDouble(0), 1679.9);
        auto aOld = readHeader(aRaw.string() + "_old_hdr");
        EXPECT_TRUE((*aOld)["ChannelInfo.PRFChanges"].isEmpty());
    }
    EXPECT_NE(aBox.log().find("CHANGES IN PRF - *********************** 1 PRF CHANGES in " + aRaw.string()),
              std::string::npos);
    EXPECT_NE(aBox.trace().find("OLD PRIC[2820];  NEW PRIC [2800]"), std::string::npos);

    // A second run keeps the first copy of the original header.
    const auto aOldTime = std::filesystem::last_write_time(aRaw.string() + "_old.sml");
    ASSERT_EQ(aBox.run(aBox.writeArguments(aArgs)).mStatus, 0);
    EXPECT_EQ(std::filesystem::last_write_time(aRaw.string() + "_old.sml"), aOldTime);

    // A constant code is one segment; an ENVISAT-1 product is left untouched.
    const auto aSteady = makeRaw(aBox, "steady_raw");
    aArgs[0] = aSteady.string();
    ASSERT_EQ(aBox.run(aBox.writeArguments(aArgs)).mStatus, 0);
    EXPECT_NE(aBox.log().find("\n\nNO PRF :  "), std::string::npos);
    qtest::SmallRawOptions aEnvisat;
    aEnvisat.mSensor = "ENVISAT-1";
    aArgs[0] = makeRaw(aBox, "asar_raw", aEnvisat).string();
    ASSERT_EQ(aBox.run(aBox.writeArguments(aArgs)).mStatus, 0);
    EXPECT_FALSE(std::filesystem::exists(aArgs[0] + "_old.sml"));
}

TEST(DriverProcess, ASimulatedErsSceneRunsThroughTheWholeChain)
{
    DriverSandbox aBox;
    const auto aRaw = aBox.data() / "sim_raw";
    const RunResult aSim = qtest::runProgram(qtest::binaryDir() / "qorvex_simulate",
                                             {"--preset", "ers2", "--lines", "512", "--samples", "768", "--targets",
                                              "grid:1x1", "--prf-change", "300:2800", "--quiet", "--out", aRaw.string(),
                                              "--config", aBox.etc().string()},
                                             {}, aBox.data());
    ASSERT_EQ(aSim.mStatus, 0) << aSim.mStderr;
    auto aArgs = DriverSandbox::defaultArguments(aRaw, aBox.data() / "sim_slc");
    aArgs[7] = "OK";   // intermediate files deleted
    aArgs[10] = "OK";  // ambiguity resolution: steps 0, 1, 2, 4, 3, 3, 3 and 5
    const RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 300);
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    EXPECT_TRUE(std::filesystem::exists(aBox.data() / "sim_slc"));
    EXPECT_FALSE(std::filesystem::exists(aBox.data() / "sim_rc__amb1_mli"));  // shut functions of steps 4 and 5
    EXPECT_FALSE(std::filesystem::exists(aBox.data() / "sim_rc"));
    // The PRF scan found the simulated change, and step 0 made the parameter file.
    qtest::InProcessEnvironment aEnv;
    auto aHeader = readHeader(aRaw.string() + "_hdr");
    const CDescriptionField& aChanges = (*aHeader)["ChannelInfo.PRFChanges"];
    ASSERT_EQ(aChanges.getNbrOfRows(), 2);
    EXPECT_DOUBLE_EQ(aChanges.getDouble(1, 0), 300.0);
    EXPECT_TRUE(std::filesystem::exists(aBox.data() / "sim_par.sml"));
}

}  // namespace

// ------------------------------------------------------------------------------------------------
// Hostile and broken input: a clean failure id, nothing destroyed, no hang.

namespace {

/// Replaces the first occurrence of theOld in a file.
void replaceInFile(const std::filesystem::path& thePath, const std::string& theOld, const std::string& theNew)
{
    std::string aText = qtest::readFile(thePath);
    const std::size_t aPos = aText.find(theOld);
    ASSERT_NE(aPos, std::string::npos) << theOld;
    qtest::writeFile(thePath, aText.replace(aPos, theOld.size(), theNew));
}

}  // namespace

TEST(DriverProcess, ArgumentsWithANulByteOrAnEndlessLineAndProductsOverInputsAreRefused)
{
    DriverSandbox aBox;
    const auto aRaw = makeRaw(aBox, "raw");
    const std::string aHeader = qtest::readFile(aRaw.string() + ".sml");
    // A NUL inside the output root would cut the parameter file's name down to the input's.
    auto aArgs = DriverSandbox::defaultArguments(aRaw, aBox.data() / "x_slc");
    aArgs[2] = aRaw.string() + std::string("\0x_slc", 6);
    expectFailureReported(aBox, aBox.run(aBox.writeArguments(aArgs)), 456962);
    EXPECT_EQ(qtest::readFile(aRaw.string() + ".sml"), aHeader);

    aArgs = DriverSandbox::defaultArguments(aRaw, aBox.data() / "x_slc");
    aArgs[8] = std::string(20000, 'a');
    expectFailureReported(aBox, aBox.run(aBox.writeArguments(aArgs)), 456962);
    // An endless arguments file is refused at its first byte, not read whole.
    EXPECT_EQ(aBox.run("/dev/zero", {}, 60).mExitId, 456962);

    // Output root "a_slc" makes the parameter file "a_par": the input itself.
    const auto aPar = makeRaw(aBox, "a_par");
    const std::string aParHeader = qtest::readFile(aPar.string() + ".sml");
    const RunResult aOver = aBox.run(aBox.writeArguments(DriverSandbox::defaultArguments(aPar, aBox.data() / "a_slc")));
    expectFailureReported(aBox, aOver, 456962);
    EXPECT_EQ(qtest::readFile(aPar.string() + ".sml"), aParHeader);
}

TEST(DriverProcess, APrfScanOverTextsTheReaderCannotGiveBackKeepsAByteCopyAndAReadableHeader)
{
    DriverSandbox aBox;
    const auto aRaw = makeRaw(aBox, "raw");
    replaceInFile(aRaw.string() + ".sml", "<Chirp>UP_CHIRP</Chirp>", "<Chirp>UP####BIGA\x85_CHIRP</Chirp>");
    const std::string aOriginal = qtest::readFile(aRaw.string() + ".sml");
    auto aArgs = DriverSandbox::defaultArguments(aRaw, aBox.data() / "x_slc");
    aArgs[1] = "NotOK";
    aArgs[14] = "OK";  // the scan alone
    const RunResult aRun = aBox.run(aBox.writeArguments(aArgs));
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    EXPECT_EQ(qtest::readFile(aRaw.string() + "_old.sml"), aOriginal);
    qtest::InProcessEnvironment aEnv;
    auto aHeader = readHeader(aRaw.string() + "_hdr");
    EXPECT_EQ((*aHeader)["ChannelInfo.PRFChanges"].getNbrOfRows(), 1);
}

TEST(DriverProcess, RecordSizesThatWrapAroundEndWithTheRastersFailureId)
{
    DriverSandbox aBox;
    const auto aRaw = makeRaw(aBox, "raw");
    // 128 bytes of line + prefix + suffix = 2^32: a 32-bit record length of zero.
    replaceInFile(aRaw.string() + ".sml", "<RowPrefix>412</RowPrefix>", "<RowPrefix>2147483584</RowPrefix>");
    replaceInFile(aRaw.string() + ".sml", "<RowSuffix>0</RowSuffix>", "<RowSuffix>2147483584</RowSuffix>");
    expectFailureReported(aBox, aBox.run(aBox.writeArguments(DriverSandbox::defaultArguments(aRaw, aBox.data() / "x_slc"))),
                          261121);
}

TEST(DriverProcess, AWorkingFileThatCannotBeWrittenEndsTheRunQuicklyWithTheIdOnStandardError)
{
    DriverSandbox aBox;
    const auto aRaw = makeRaw(aBox, "raw");
    std::filesystem::resize_file(aRaw, 20 * (412 + 128));  // the scan fails at line 20, after 20 percents
    std::filesystem::create_directory(aBox.workingFile());
    auto aArgs = DriverSandbox::defaultArguments(aRaw, aBox.data() / "x_slc");
    aArgs[14] = "OK";
    // With a pause at every percent this run would take a minute; it must end well inside the limit.
    const RunResult aRun = aBox.run(aBox.writeArguments(aArgs), {}, 15);
    EXPECT_EQ(aRun.mExitId, 261125) << aRun.mStderr;
    EXPECT_NE(qtest::readFile(aBox.workingFile().string() + "_error").find("[EC : 261125]"), std::string::npos);
}
