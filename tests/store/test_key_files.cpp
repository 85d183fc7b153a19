// Key files and mandatory files: the delivered files, the key-file format and its failures.
#include <fstream>
#include <map>
#include <set>

#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_errors.h"
#include "store_test_util.h"

namespace fs = std::filesystem;

TEST(StoreKeyFiles, AllDeliveredKeyFilesLoadAndNoNameStandsInTwoSections)
{
    qtest::InProcessEnvironment aEnv;
    auto aHeader = CDescriptionHeader::makeFull();
    ASSERT_EQ(aHeader->mSectionNbr, CQORV_ALL_SECTIONS_NBR);
    std::map<std::string, std::string> aOwner;
    int aFields = 0;
    for (const auto& aSection : aHeader->mSections) {
        for (const auto& aField : aSection->mFields) {
            ++aFields;
            const auto [aIt, aNew] = aOwner.emplace(aField->mName, aSection->mName);
            EXPECT_TRUE(aNew) << aField->mName << " stands in " << aIt->second << " and " << aSection->mName;
        }
    }
    EXPECT_EQ(aFields, 188);
    // The ENVI description section is the 22nd key file.
    CDescriptionSection aEnvi("ENVI_HeaderDescriptionType");
    EXPECT_EQ(aEnvi.mFieldNbr, 15);
    EXPECT_EQ(aEnvi.findField("DATATYPE_VALS")->mStructure, CQORV_DS_VECTOR);
    // Both orders of the sections find every name in the same field.
    std::vector<std::string> aReverse(CQORV_ALL_SECTIONS, CQORV_ALL_SECTIONS + CQORV_ALL_SECTIONS_NBR);
    std::reverse(aReverse.begin(), aReverse.end());
    CDescriptionHeader aReversed(aReverse);
    for (const auto& [aName, aSection] : aOwner) {
        const std::string aKey = aSection + "." + aName;
        EXPECT_EQ(aReversed.findField(aName.c_str()), aReversed.findField(aKey.c_str())) << aName;
    }
    // The processing parameter file stands on its own key file.
    CDescriptionSection aPar("sar_processing");
    for (const char* aName : {"Title", "Channel", "FirstPixel", "FirstLine", "ProcessedLines", "RgFFT", "AzPresumming",
                              "AzSubaperture", "AzBandWidthFraction", "AzDetectionLooks", "RgDetectionLooks", "Velocity"})
        EXPECT_NE(aPar.findField(aName), nullptr) << aName;
}

TEST(StoreKeyFiles, FormatRules)
{
    qtest::InProcessEnvironment aEnv;
    const fs::path aKey = aEnv.workPath("format.key");
    qtest::writeFile(aKey,
                     "; leading comment\n"
                     "[Other]\n"
                     "Skipped = I\n"
                     " [Wanted] ; header in the second column\n"
                     "ProcessedLines = I ; comment\n"
                     "a line without an equal sign\n"
                     "\n"
                     "Ratio\t=\tF\r\n"
                     "Table = 3VI(colA, colB, colC)\n");
    CDescriptionSection aSection;
    aSection.mName = "Wanted";
    ASSERT_TRUE(aSection.loadKeys(aKey.c_str(), "Wanted"));
    ASSERT_EQ(aSection.mFieldNbr, 6);
    EXPECT_EQ(aSection.findField("Skipped"), nullptr);
    const CDescriptionField* aLines = aSection.findField("ProcessedLines");
    ASSERT_NE(aLines, nullptr);
    EXPECT_EQ(aLines->mStructure, CQORV_DS_SCALAR);
    EXPECT_EQ(aLines->mDataType, CQORV_DT_INTEGER);
    EXPECT_EQ(aSection.findField("Ratio")->mDataType, CQORV_DT_DOUBLE);
    EXPECT_EQ(aSection.findField("colC")->mStructure, CQORV_DS_VECTOR);
    EXPECT_EQ(aSection.findField("colC")->mParentIndex, 2);
    EXPECT_EQ(aSection.mFields[2]->mName, "Table");

    // A header in the third column is no header.
    qtest::writeFile(aKey, "  [Wanted]\nX = I\n");
    EXPECT_FALSE(aSection.loadKeys(aKey.c_str(), "Wanted"));
    EXPECT_EQ(aSection.mFieldNbr, 0);
    // Without a name, the first header names the section.
    qtest::writeFile(aKey, "[First]\nX = S\n");
    CDescriptionSection aAny;
    EXPECT_TRUE(aAny.loadKeys(aKey.c_str(), nullptr));
    EXPECT_EQ(aAny.mName, "First");
}

TEST(StoreKeyFiles, Failures)
{
    qtest::InProcessEnvironment aEnv;
    const fs::path aKey = aEnv.workPath("bad.key");
    CDescriptionSection aSection;
    EXPECT_QORV_FAILURE(aSection.loadKeys(aEnv.workPath("missing.key").c_str(), "X"), CQORV_ERR_MISSING_FILE);
    EXPECT_NE(aEnv.trace().find("Error: missing key file "), std::string::npos);
    aEnv.reinit();
    for (const char* aType : {"Q", "VX", "MMD", "0I", "2MD", "I2", ""}) {
        SCOPED_TRACE(aType);
        qtest::writeFile(aKey, std::string("[X]\nField = ") + aType + "\n");
        EXPECT_QORV_FAILURE(aSection.loadKeys(aKey.c_str(), "X"), CQORV_ERR_FIELD_TYPE);
    }
    qtest::writeFile(aKey, "[X]\nPair = 3D a b\n");
    EXPECT_QORV_FAILURE(aSection.loadKeys(aKey.c_str(), "X"), CQORV_ERR_KEY_FILE);

    // 5049 field lines load; the 5050th fails.
    std::string aText = "[X]\n";
    for (int i = 0; i < 5049; ++i) aText += "F" + std::to_string(i) + " = D\n";
    qtest::writeFile(aKey, aText);
    EXPECT_TRUE(aSection.loadKeys(aKey.c_str(), "X"));
    EXPECT_EQ(aSection.mFieldNbr, 5049);
    aEnv.reinit();
    qtest::writeFile(aKey, aText + "Last = D\n");
    EXPECT_QORV_FAILURE(aSection.loadKeys(aKey.c_str(), "X"), CQORV_ERR_KEY_FILE);
    EXPECT_NE(aEnv.trace().find("CQORV_DS_MAX_NBR_FIELDS = 5050"), std::string::npos);

    // A section whose key file is missing: the header can't be built.
    aEnv.reinit();
    EXPECT_QORV_FAILURE(CDescriptionHeader({"NoSuchSection"}), CQORV_ERR_MISSING_FILE);
}

TEST(StoreMandatory, RawInputFileNamesTheFirstIncompleteSection)
{
    qtest::InProcessEnvironment aEnv;
    auto aHeader = CDescriptionHeader::makeFull();
    ASSERT_TRUE(aHeader->read(storetest::testDir().append("golden/ers_raw_example.sml").c_str(), true));
    EXPECT_TRUE(aHeader->checkMandatory("raw_input", true));

    (*aHeader)["ChannelInfo.PulseDuration"].reset();
    (*aHeader)["Sensor.Chirp"].reset();
    EXPECT_FALSE(aHeader->checkMandatory("raw_input", false));
    const std::string aLog = aEnv.log();
    EXPECT_NE(aLog.find("Mandatory Field [PulseDuration] is not found in [ChannelInfo] section"), std::string::npos);
    EXPECT_EQ(aLog.find("[Chirp]"), std::string::npos);  // later sections are not examined
    EXPECT_QORV_FAILURE(aHeader->checkMandatory("raw_input", true), CQORV_ERR_MANDATORY);

    // A mandatory file given by its path; names the section doesn't know are passed over.
    aEnv.reinit();
    const fs::path aFile = aEnv.workPath("own.mandatory");
    qtest::writeFile(aFile, "[Sensor]\nSensorName =\nNoSuchName =\n");
    EXPECT_TRUE(aHeader->checkMandatory(aFile.c_str(), true));
}
