// Step 0, processing parameter construction, and the header chain of a list of products.
#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_errors.h"
#include "qorv_header_chain.h"
#include "qorv_proc_param.h"
#include "store_test_util.h"

namespace fs = std::filesystem;

namespace {

/// A catalogue directory with everything delivered but the defaults file.
class DesWithoutDefaults {
public:
    DesWithoutDefaults() : mDir("qorvex-des")
    {
        for (const auto& aEntry : fs::directory_iterator(qtest::sourceShareDir() / "des"))
            if (aEntry.path().filename() != "sar_processing_default_par")
                fs::copy_file(aEntry.path(), mDir.path() / aEntry.path().filename());
    }
    const fs::path& path() const { return mDir.path(); }

private:
    qtest::TempDir mDir;
};

/// Writes a raw product's header "<name>.sml" and returns the raw file's name.
std::string writeRawHeader(const qtest::InProcessEnvironment& theEnv, const std::string& theName, bool theVelocity)
{
    auto aHeader = CDescriptionHeader::makeFull();
    storetest::fillErsExample(*aHeader);
    if (!theVelocity) (*aHeader)["Processing.ProcessingVelocity"].reset();
    const std::string aRaw = theEnv.workPath(theName).string();
    EXPECT_TRUE(aHeader->write((aRaw + ".sml").c_str(), true, false));
    return aRaw;
}

int runStep0(const std::string& thePar, const std::string& theRaw)
{
    std::string aArgs[] = {"Processing parameters construction", thePar, theRaw, "NotOK"};
    char* aArgv[] = {aArgs[0].data(), aArgs[1].data(), aArgs[2].data(), aArgs[3].data()};
    return qorv_proc_param(4, aArgv);
}

std::unique_ptr<CDescriptionHeader> readPar(const std::string& thePar)
{
    auto aPar = std::make_unique<CDescriptionHeader>(std::initializer_list<const char*>{"sar_processing"});
    EXPECT_TRUE(aPar->read(thePar.c_str(), true));
    return aPar;
}

}  // namespace

TEST(StoreStep0, WithTheDeliveredDefaultsFile)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aRaw = writeRawHeader(aEnv, "scene_raw", true);
    const std::string aPar = aEnv.workPath("scene_par").string();
    ASSERT_EQ(runStep0(aPar, aRaw), 0);
    EXPECT_FALSE(fs::exists(aPar));  // the file is "<name>.sml"
    auto h = readPar(aPar);
    EXPECT_STREQ((*h)["Title"].getString(), "ERS-2");
    EXPECT_STREQ((*h)["Channel"].getString(), "VV");
    EXPECT_EQ((*h)["RgFFT"].getInteger(), 5616);
    EXPECT_EQ((*h)["ProcessedLines"].getInteger(), 28000);
    EXPECT_EQ((*h)["Velocity"].getDouble(), 7109.5);  // the input's velocity wins
    EXPECT_EQ((*h)["AzBandWidthFraction"].getDouble(), 0.8);
    EXPECT_EQ((*h)["AzPresumming"].getInteger(), 1);
    const std::string aTrace = aEnv.trace();
    EXPECT_NE(aTrace.find("*** VDQ processing parameter definition v1.4 29-oct-99 xq ***"), std::string::npos);
    EXPECT_NE(aTrace.find("writing new parameters to parameter file " + aPar), std::string::npos);
    EXPECT_EQ(aTrace.find("Error: missing processing parameter file "), std::string::npos);
    // The file holds the one section.
    EXPECT_EQ(qtest::readFile(aPar + ".sml").find("<RasterInfo>"), std::string::npos);
}

TEST(StoreStep0, WithoutDefaultsFileAndWithoutVelocity)
{
    DesWithoutDefaults aDes;
    qtest::ConfigOptions aOptions;
    aOptions.mDesDir = aDes.path();
    qtest::InProcessEnvironment aEnv(aOptions);
    const std::string aRaw = writeRawHeader(aEnv, "scene_raw", false);
    const std::string aPar = aEnv.workPath("scene_par").string();
    ASSERT_EQ(runStep0(aPar, aRaw), 0);
    auto h = readPar(aPar);
    EXPECT_EQ((*h)["FirstPixel"].getInteger(), 0);
    EXPECT_EQ((*h)["FirstLine"].getInteger(), 0);
    EXPECT_EQ((*h)["AzBandWidthFraction"].getDouble(), 0.8);
    EXPECT_EQ((*h)["AzSubaperture"].getInteger(), 1);
    EXPECT_EQ((*h)["AzDetectionLooks"].getInteger(), 1);
    EXPECT_EQ((*h)["RgDetectionLooks"].getInteger(), 1);
    EXPECT_EQ((*h)["Velocity"].getDouble(), 0.0);
    EXPECT_NE(aEnv.trace().find("Error: missing processing parameter file " + (aDes.path() / "sar_processing_default_par").string()),
              std::string::npos);
}

TEST(StoreStep0, DefaultsFileValuesStandAndAnOldParameterFileIsReplaced)
{
    DesWithoutDefaults aDes;
    qtest::ConfigOptions aOptions;
    aOptions.mDesDir = aDes.path();
    qtest::InProcessEnvironment aEnv(aOptions);
    CDescriptionHeader aDefaults({"sar_processing"});
    aDefaults["RgFFT"].setValue(8192);
    aDefaults["Velocity"].setValue(7000.0);
    aDefaults["AzPresumming"].setValue(2);
    ASSERT_TRUE(aDefaults.writeXML((aDes.path() / "sar_processing_default_par").c_str(), true, true));

    const std::string aPar = aEnv.workPath("scene_par").string();
    qtest::writeFile(aPar + ".sml", "stale content");
    const std::string aRaw = writeRawHeader(aEnv, "scene_raw", false);
    ASSERT_EQ(runStep0(aPar, aRaw), 0);
    auto h = readPar(aPar);
    EXPECT_EQ((*h)["RgFFT"].getInteger(), 8192);       // only empty fields are filled
    EXPECT_EQ((*h)["Velocity"].getDouble(), 7000.0);   // no velocity in the input
    EXPECT_EQ((*h)["AzPresumming"].getInteger(), 2);
    EXPECT_TRUE((*h)["FirstLine"].isEmpty());          // the built-in defaults are not used
    EXPECT_EQ((*h)["ProcessedLines"].getInteger(), 28000);

    writeRawHeader(aEnv, "scene_raw", true);
    ASSERT_EQ(runStep0(aPar, aRaw), 0);
    EXPECT_EQ((*readPar(aPar))["Velocity"].getDouble(), 7109.5);
}

TEST(StoreStep0, Failures)
{
    qtest::InProcessEnvironment aEnv;
    std::string aArgs[] = {"Processing parameters construction", "x_par"};
    char* aArgv[] = {aArgs[0].data(), aArgs[1].data()};
    EXPECT_QORV_FAILURE(qorv_proc_param(2, aArgv), CQORV_ERR_ARGUMENT_COUNT);
    EXPECT_NE(aEnv.trace().find("processing_param    processing parameter file name (output)"), std::string::npos);
    aEnv.reinit();
    EXPECT_QORV_FAILURE(runStep0(aEnv.workPath("p_par").string(), aEnv.workPath("nothing").string()),
                        CQORV_ERR_MISSING_FILE);
    EXPECT_NE(aEnv.trace().find("Error: missing parameter file "), std::string::npos);
    aEnv.reinit();
    const std::string aRaw = writeRawHeader(aEnv, "scene_raw", true);
    fs::create_directories(aEnv.workPath("blocked_par.sml") / "inner");
    EXPECT_QORV_FAILURE(runStep0(aEnv.workPath("blocked_par").string(), aRaw), CQORV_ERR_CREATE_FILE);
    EXPECT_NE(aEnv.trace().find("Error while writing parameter file "), std::string::npos);
}

TEST(StoreHeaderChain, CopyAndInheritKeepTheTargetsChannel)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aFirst = writeRawHeader(aEnv, "first_raw", true);
    auto aSecond = CDescriptionHeader::makeFull();
    (*aSecond)["ChannelInfo.Description"].resize(1, 1);
    (*aSecond)["ChannelInfo.Description"].setValue(0, "HV");
    (*aSecond)["sar_processing.Channel"].setValue("HV");
    (*aSecond)["RasterInfo.NrOfLinesPerImage"].setValue(5);
    const std::string aSecondRaw = aEnv.workPath("second_raw").string();
    ASSERT_TRUE(aSecond->write((aSecondRaw + "_hdr").c_str(), true, false));

    fdfInheritHeader(aFirst.c_str(), aSecondRaw.c_str(), "");
    auto aResult = CDescriptionHeader::makeFull();
    ASSERT_TRUE(aResult->read((aSecondRaw + "_hdr").c_str(), true));
    EXPECT_STREQ((*aResult)["Description"].getString(0), "HV");
    EXPECT_STREQ((*aResult)["sar_processing.Channel"].getString(), "HV");
    EXPECT_EQ((*aResult)["NrOfLinesPerImage"].getInteger(), 28000);  // the source's estimates rule
    EXPECT_EQ((*aResult)["PRF"].getDouble(0), 1679.902394);

    fdfCopyHeader(aFirst.c_str(), aEnv.workPath("copy_raw").c_str(), "_hdr");
    EXPECT_EQ(qtest::readFile(aEnv.workPath("copy_raw.sml")), qtest::readFile(aFirst + ".sml"));

    EXPECT_QORV_FAILURE(fdfCopyHeader(aEnv.workPath("none").c_str(), aFirst.c_str(), "_hdr"), CQORV_ERR_MISSING_FILE);
    aEnv.reinit();
    EXPECT_QORV_FAILURE(fdfInheritHeader(aFirst.c_str(), aEnv.workPath("none").c_str(), ""), CQORV_ERR_MISSING_FILE);
    aEnv.reinit();
    fs::create_directories(aEnv.workPath("dir_raw.sml") / "inner");
    EXPECT_QORV_FAILURE(fdfCopyHeader(aFirst.c_str(), aEnv.workPath("dir_raw").c_str(), "_hdr"), CQORV_ERR_WRITE_FILE);
}
