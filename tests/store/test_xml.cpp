// Header files: exact text against golden files, round trips, the reader's rules, the name
// handling of read and write, malformed input, update in place, atomic writes, the text form.
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <unistd.h>

#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_description_xml.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "store_test_util.h"

namespace fs = std::filesystem;
using storetest::StoreEnv;

namespace {

const char* CROOT =
    "<?xml version=\"1.0\" ?>\n"
    "<HEADER_INFO xmlns=\"http://www.qorvex.org/xml/QorvexHeaderSchema\"\n"
    "\txmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\"\n"
    "\txsi:schemaLocation=\"http://www.qorvex.org/xml/QorvexHeaderSchema\n"
    "\thttp://www.qorvex.org/xml/QorvexHeaderSchema/QorvexHeaderSchema_version_1.0.xsd\">\n";

/// Compares a written file with a golden file; QORVEX_UPDATE_GOLDEN=1 rewrites the golden file instead.
void expectGolden(const fs::path& theWritten, const std::string& theName)
{
    const fs::path aGolden = storetest::testDir() / "golden" / theName;
    if (std::getenv("QORVEX_UPDATE_GOLDEN")) fs::copy_file(theWritten, aGolden, fs::copy_options::overwrite_existing);
    EXPECT_EQ(qtest::readFile(theWritten), qtest::readFile(aGolden)) << theName;
}

void expectTestSectionValues(const CDescriptionHeader& h)
{
    EXPECT_EQ(h["StoreTest.IntScalar"].getInteger(), -42);
    EXPECT_EQ(h["StoreTest.DblScalar"].getDouble(), 1679.9);
    EXPECT_STREQ(h["StoreTest.StrScalar"].getString(), "a&b <c> \"d\" 'e'");
    ASSERT_EQ(h["StoreTest.IntVector"].getNbrOfElements(), 3);
    EXPECT_EQ(h["StoreTest.IntVector"].getInteger(2), 2147483645);
    ASSERT_EQ(h["StoreTest.DblVector"].getNbrOfElements(), 4);
    EXPECT_EQ(h["StoreTest.DblVector"].getDouble(0), 0.1);
    EXPECT_TRUE(std::isnan(h["StoreTest.DblVector"].getDouble(1)));
    EXPECT_EQ(h["StoreTest.DblVector"].getDouble(2), -3.712e-05);
    EXPECT_EQ(h["StoreTest.DblVector"].getDouble(3), 5.3e9);
    EXPECT_STREQ(h["StoreTest.StrVector"].getString(0), "HH");
    EXPECT_STREQ(h["StoreTest.StrVector"].getString(1), "\"\"");  // never set: two double quotes
    EXPECT_EQ(h["StoreTest.IntMatrix"].getInteger(1, 1), 11);
    EXPECT_EQ(h["StoreTest.DblMatrix"].getDouble(0, 1), 35000.5);
    EXPECT_STREQ(h["StoreTest.StrMatrix"].getString(0, 0), "ORIGIN DATA");
    EXPECT_EQ(h["StoreTest.PairB"].getDouble(), -2.25);
    EXPECT_EQ(h["StoreTest.Track"].getNbrOfElements(), 2);
    EXPECT_EQ(h["StoreTest.TrackV"].getDouble(1), 7101.0);
}

}  // namespace

TEST(StoreXml, WrittenTextMatchesTheGoldenFiles)
{
    StoreEnv aEnv;
    auto aHeader = storetest::makeTestHeader();
    storetest::fillTestSection(*aHeader);
    ASSERT_TRUE(aHeader->write(aEnv.path("all_types_hdr").c_str(), true, false));
    EXPECT_FALSE(fs::exists(aEnv.path("all_types_hdr")));  // XML goes to ".sml" only
    expectGolden(aEnv.path("all_types.sml"), "all_types.sml");

    auto aErs = CDescriptionHeader::makeFull();
    storetest::fillErsExample(*aErs);
    ASSERT_TRUE(aErs->write(aEnv.path("ers_raw.sml").c_str(), true, false));
    expectGolden(aEnv.path("ers_raw.sml"), "ers_raw_example.sml");

    // A header whose sections are all empty: the root element alone. Another root tag stands bare.
    auto aEmpty = storetest::makeTestHeader();
    ASSERT_TRUE(aEmpty->writeXML(aEnv.path("empty.sml").c_str(), true, true));
    EXPECT_EQ(qtest::readFile(aEnv.path("empty.sml")), std::string(CROOT) + "</HEADER_INFO>\n");
    CDescriptionHeader aOther("PARAMETERS_INFO_test", {"StoreSecond"});
    aOther["Count"].setValue(3);
    ASSERT_TRUE(aOther.writeXML(aEnv.path("other.sml").c_str(), true, true));
    EXPECT_EQ(qtest::readFile(aEnv.path("other.sml")),
              "<?xml version=\"1.0\" ?>\n<PARAMETERS_INFO_test>\n   <StoreSecond>\n      <Count>3</Count>\n"
              "   </StoreSecond>\n</PARAMETERS_INFO_test>\n");
    CDescriptionHeader aBack("PARAMETERS_INFO_test", {"StoreSecond"});
    ASSERT_TRUE(aBack.read(aEnv.path("other.sml").c_str(), true));
    EXPECT_EQ(aBack["Count"].getInteger(), 3);
}

TEST(StoreXml, RoundTripKeepsEveryStructureAndType)
{
    StoreEnv aEnv;
    auto aHeader = storetest::makeTestHeader();
    storetest::fillTestSection(*aHeader);
    (*aHeader)["StoreSecond.Count"].setValue(-1);
    ASSERT_TRUE(aHeader->write(aEnv.path("x.sml").c_str(), true, false));
    auto aBack = storetest::makeTestHeader();
    (*aBack)["StoreSecond.Note"].setValue("stale");  // reading empties every field first
    ASSERT_TRUE(aBack->read(aEnv.path("x_hdr").c_str(), true));
    expectTestSectionValues(*aBack);
    EXPECT_EQ((*aBack)["StoreSecond.Count"].getInteger(), -1);


    // A header written by the reader's result is the same text again.
    ASSERT_TRUE(aBack->write(aEnv.path("y.sml").c_str(), true, false));
    std::string aFirst = qtest::readFile(aEnv.path("x.sml"));
    std::string aSecond = qtest::readFile(aEnv.path("y.sml"));
    // The unset string element came back as the text of two quotes, which is written escaped twice.
    EXPECT_NE(aSecond.find("<ValueString ID = \"1\">&quot;&quot;</ValueString>"), std::string::npos);
    EXPECT_EQ(aFirst, aSecond);

    // A text over two lines keeps its line break and its inner blanks.
    (*aHeader)["StoreSecond.Note"].setValue("line one\n   line two  ");
    ASSERT_TRUE(aHeader->write(aEnv.path("multi.sml").c_str(), true, false));
    ASSERT_TRUE(aBack->read(aEnv.path("multi.sml").c_str(), true));
    EXPECT_STREQ((*aBack)["StoreSecond.Note"].getString(), "line one\n   line two  ");
}

// Doubles are written as printf "%.30g" writes them and read back exactly; NaN has its own word.
TEST(StoreXml, DoublesHaveThirtySignificantDigitsLikePrintf)
{
    char aExpected[128];
    double aBack = 0.0;
    auto aCheck = [&](double theValue) {
        std::snprintf(aExpected, sizeof aExpected, "%.30g", theValue);
        return fqorvFormatDouble(theValue) == aExpected && fqorvParseDouble(aExpected, aBack) && aBack == theValue;
    };
    for (double aValue : {0.0, -0.0, 1.0, 41.8, 5616.0, 1e21, 1e-7, 123456789012345678.0}) EXPECT_TRUE(aCheck(aValue)) << aValue;
    std::mt19937_64 aRandom(7);
    std::uniform_real_distribution<double> aMantissa(-10.0, 10.0);
    std::uniform_int_distribution<int> aExponent(-300, 300);
    for (int i = 0; i < 20000; ++i)
        ASSERT_TRUE(aCheck(std::ldexp(aMantissa(aRandom), aExponent(aRandom) / 10 * (i % 3 == 0 ? 10 : 1)))) << aExpected;

    EXPECT_EQ(fqorvFormatDouble(std::nan("")), "NaN");
    EXPECT_TRUE(fqorvParseDouble(" NaN ", aBack) && std::isnan(aBack));
    EXPECT_TRUE(fqorvParseDouble("+1.5e3", aBack) && aBack == 1500.0);
    EXPECT_FALSE(fqorvParseDouble("1.5x", aBack));
    EXPECT_FALSE(fqorvParseDouble("", aBack));
    int aInt = 0;
    EXPECT_TRUE(fqorvParseInteger(" -17\t", aInt) && aInt == -17);
    EXPECT_FALSE(fqorvParseInteger("1.0", aInt));
    EXPECT_FALSE(fqorvParseInteger("4294967296", aInt));
}

// The reader's pre-pass gives entities and Latin-1 letters back as characters; the writer escapes
// the five XML characters; the parser refuses a tree beyond its node count or depth.
TEST(StoreXml, PrepassAndItsReverse)
{
    EXPECT_EQ(fqorvXmlEscape("a&b<>\"'"), "a&amp;b&lt;&gt;&quot;&apos;");
    qtest::InProcessEnvironment aEnv;
    const fs::path aFile = aEnv.workPath("amp.sml");
    qtest::writeFile(aFile, "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n<Sensor>\n"
                            "<SensorName>\t  a&amp;b &lt;&gt;&quot;&apos;</SensorName>\n<SARMode>Caf\xE9\xF1\xFC\xF6\xB0</SARMode>\n"
                            "</Sensor>\n</HEADER_INFO>\n");
    CDescriptionHeader aHeader({"Sensor"});
    ASSERT_TRUE(aHeader.read(aFile.c_str(), true));
    EXPECT_STREQ(aHeader["SensorName"].getString(), "a&b <>\"'");
    EXPECT_STREQ(aHeader["SARMode"].getString(), "Cafenuod");
    EXPECT_NE(fqorv_xml_parser(100, 10, aFile.c_str(), 5130), nullptr);
    EXPECT_EQ(fqorv_xml_parser(3, 10, aFile.c_str(), 5130), nullptr);
    EXPECT_EQ(fqorv_xml_parser(100, 2, aFile.c_str(), 5130), nullptr);
}

// Whatever the reader accepts comes out well formed: the marks of high bytes come back as control
// characters, and the writer carries neither those nor bytes that the pre-pass would break.
TEST(StoreXml, TextsThatDoNotSurviveTheReaderStillWriteAHeaderThatReadsBack)
{
    EXPECT_EQ(fqorvXmlEscape("a\x01\x1F\t\xC3\xA9\xE9\xC3(\x85\xC3\xA4\xF4\x90\x80\x80z"), "a  \t\xC3\xA9\xE9?(???????z");
    qtest::InProcessEnvironment aEnv;
    const fs::path aIn = aEnv.workPath("big.sml");
    qtest::writeFile(aIn, "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n<Sensor>\n<SensorName>abc####BIGAdef</SensorName>\n"
                          "<SARMode>x\x85\x9Ay</SARMode>\n</Sensor>\n</HEADER_INFO>\n");
    CDescriptionHeader aHeader({"Sensor"});
    ASSERT_TRUE(aHeader.read(aIn.c_str(), true));
    ASSERT_LT(static_cast<unsigned char>(aHeader["SARMode"].getString()[1]), 0x20);
    const fs::path aOut = aEnv.workPath("big_out.sml");
    ASSERT_TRUE(aHeader.write(aOut.c_str(), true, false));
    CDescriptionHeader aBack({"Sensor"});
    ASSERT_TRUE(aBack.read(aOut.c_str(), true));
    EXPECT_EQ(std::string(aBack["SensorName"].getString()).substr(0, 3), "abc");
    EXPECT_EQ(std::string(aBack["SARMode"].getString()).substr(0, 1), "x");
}

TEST(StoreXml, ReaderFindsFieldsInAnyOrderAndSkipsUnknownNodes)
{
    qtest::InProcessEnvironment aEnv;
    const fs::path aFile = aEnv.workPath("order.sml");
    qtest::writeFile(aFile,
                     "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n"
                     "  <Processing>\n"
                     "    <NAzimuthLooks>3</NAzimuthLooks>\n"
                     "    <SomethingElse><VectorDouble NumberOfElements = \"1\"><ValueDouble ID = \"0\">1</ValueDouble></VectorDouble></SomethingElse>\n"
                     "    <SlantRange><VectorDouble NumberOfElements = \"2\">\n"
                     "      <ValueDouble ID = \"0\">830000.5</ValueDouble><ValueDouble ID = \"1\">  -NaN </ValueDouble>\n"
                     "    </VectorDouble></SlantRange>\n"
                     "    <DopCenRangeCoeff><MatrixDouble NumberOfRows = \"2\" NumberOfColumns = \"1\">\n"
                     "      <MatrixRowDouble ID = \"0\"><ValueDouble ID = \"0\">1</ValueDouble></MatrixRowDouble>\n"
                     "      <MatrixRowDouble ID = \"1\"><ValueDouble ID = \"0\">2</ValueDouble></MatrixRowDouble>\n"
                     "    </MatrixDouble></DopCenRangeCoeff>\n"
                     "    <NRangeLooks>2</NRangeLooks>\n"
                     "  </Processing>\n"
                     "  <Sensor><SensorName>ERS-1</SensorName><Spectrum></Spectrum></Sensor>\n"
                     "</HEADER_INFO>\n");
    auto aHeader = CDescriptionHeader::makeFull();
    ASSERT_TRUE(aHeader->read(aFile.c_str(), true));
    CDescriptionHeader& h = *aHeader;
    EXPECT_EQ(h["NRangeLooks"].getInteger(), 2);
    EXPECT_EQ(h["NAzimuthLooks"].getInteger(), 3);
    EXPECT_EQ(h["SlantRange"].getDouble(0), 830000.5);
    EXPECT_TRUE(std::isnan(h["SlantRange"].getDouble(1)));
    EXPECT_EQ(h["DopCenRangeCoeff"].getDouble(1, 0), 2.0);
    EXPECT_STREQ(h["SensorName"].getString(), "ERS-1");
    EXPECT_STREQ(h["Spectrum"].getString(), "");
    EXPECT_TRUE(h["PixelSpacingRg"].isEmpty());

    // A root of another name is not found.
    CDescriptionHeader aOther("OTHER_ROOT", {"Sensor"});
    EXPECT_FALSE(aOther.read(aFile.c_str(), true));
    EXPECT_NE(aEnv.trace().find("NOT FOUND this->mInitialTag : OTHER_ROOT"), std::string::npos);
}

// A header written by another program, read through the raw file's name as step 0 does: full
// precision, matrices, user keys, and every mandatory key of the raw input.
TEST(StoreXml, ExternalRawSceneHeaderIsReadCompletely)
{
    const fs::path aScene = storetest::externalSceneHeader();
    if (!fs::exists(aScene)) GTEST_SKIP() << "no external scene at " << aScene;
    qtest::InProcessEnvironment aEnv;
    auto aHeader = CDescriptionHeader::makeFull();
    CDescriptionHeader& h = *aHeader;
    ASSERT_TRUE(h.read(((aScene.parent_path() / "ers_sim_raw").string() + "_hdr").c_str(), true));
    EXPECT_DOUBLE_EQ(h["PRF"].getDouble(0), 1679.90239363916384718322660774);
    EXPECT_DOUBLE_EQ(h["StateVectorData.pos_x"].getDouble(8), 5484711.55184826534241437911987);
    EXPECT_NEAR(h["Processing.DopCenRangeCoeff"].getDouble(0, 0), 310.0, 1e-9);
    EXPECT_STREQ(h["TimeFirst"].getString(), "15-MAR-1997 09:40:27.000000");
    std::string aValue;
    ASSERT_TRUE(fqorvGetUserKey(h, "SIMULATOR", aValue));
    EXPECT_EQ(aValue, "simsar 1.0");
    EXPECT_TRUE(h.checkMandatory("raw_input", true));
}

TEST(StoreXml, ReadNameHandling)
{
    StoreEnv aEnv;
    auto aHeader = storetest::makeTestHeader();
    const auto write = [&](const std::string& theName, int theValue) {
        (*aHeader)["StoreSecond.Count"].setValue(theValue);
        ASSERT_TRUE(aHeader->writeXML(aEnv.path(theName).c_str(), true, true));
    };
    auto aBack = storetest::makeTestHeader();
    const auto readCount = [&](const std::string& theName) {
        EXPECT_TRUE(aBack->read(aEnv.path(theName).c_str(), true)) << theName;
        return (*aBack)["StoreSecond.Count"].getInteger();
    };
    // XML under the "_hdr" name, then a ".sml" beside it, which wins for every spelling.
    write("p_hdr", 1);
    EXPECT_EQ(readCount("p_hdr"), 1);
    EXPECT_EQ(readCount("p"), 1);
    write("p.sml", 2);
    EXPECT_EQ(readCount("p_hdr"), 2);
    EXPECT_EQ(readCount("p_HDR"), 2);
    // A name without suffix, as given.
    write("plain.xml", 3);
    EXPECT_EQ(readCount("plain.xml"), 3);
    // Nothing there.
    EXPECT_FALSE(aBack->read(aEnv.path("none_hdr").c_str(), true));
    EXPECT_NE(aEnv.env().trace().find("Not Found\n"), std::string::npos);
    // "NotOK" names never exist.
    write("NotOK.sml", 4);
    EXPECT_FALSE(aBack->read(aEnv.path("NotOK.sml").c_str(), false));
}

TEST(StoreXml, MalformedAndWronglyTypedInput)
{
    StoreEnv aEnv;
    const fs::path aFile = aEnv.path("bad.sml");
    auto aHeader = storetest::makeTestHeader();
    const auto body = [&](const std::string& theFields) {
        qtest::writeFile(aFile, "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n<StoreTest>\n" + theFields +
                                    "</StoreTest>\n</HEADER_INFO>\n");
    };
    body("<IntScalar>1</IntScalar>\n<DblScalar>2</Dbl>\n");
    EXPECT_FALSE(aHeader->read(aFile.c_str(), false));
    EXPECT_QORV_FAILURE(aHeader->read(aFile.c_str(), true), CQORV_ERR_RASTER_ACCESS);
    EXPECT_NE(aEnv.env().trace().find("mismatched tag at line 5"), std::string::npos);

    const char* aWrong[] = {
        "<IntScalar>1.5</IntScalar>\n",
        "<DblScalar>fast</DblScalar>\n",
        "<IntScalar></IntScalar>\n",
        "<DblVector>1.0</DblVector>\n",
        "<DblVector><VectorDouble NumberOfElements = \"x\"></VectorDouble></DblVector>\n",
        "<DblVector><VectorDouble><ValueDouble ID = \"0\">1</ValueDouble></VectorDouble></DblVector>\n",
        "<IntMatrix><MatrixInteger NumberOfRows = \"1\"></MatrixInteger></IntMatrix>\n",
        "<IntScalar><VectorInteger NumberOfElements = \"1\"></VectorInteger></IntScalar>\n",
        "<Pair><VectorOfStructs_Pair NumberOfElements = \"1\" NumberOfFields = \"2\"></VectorOfStructs_Pair></Pair>\n",
        "<Track><Struct_Track NumberOfFields = \"2\"></Struct_Track></Track>\n",
        // Counts above what the file holds are refused before anything is allocated.
        "<DblVector><VectorDouble NumberOfElements = \"2000000000\"><ValueDouble ID = \"0\">1</ValueDouble>"
        "</VectorDouble></DblVector>\n",
        "<IntMatrix><MatrixInteger NumberOfRows = \"2000000000\" NumberOfColumns = \"2000000000\">"
        "</MatrixInteger></IntMatrix>\n",
        "<IntMatrix><MatrixInteger NumberOfRows = \"1\" NumberOfColumns = \"2000000000\"><MatrixRowInteger ID = \"0\">"
        "<ValueInteger ID = \"0\">1</ValueInteger></MatrixRowInteger></MatrixInteger></IntMatrix>\n",
    };
    for (const char* aFields : aWrong) {
        SCOPED_TRACE(aFields);
        aEnv.env().reinit();
        body(aFields);
        EXPECT_QORV_FAILURE(aHeader->read(aFile.c_str(), false), CQORV_ERR_FIELD_TYPE);
        EXPECT_NE(aEnv.env().trace().find("Data Type ID : "), std::string::npos);
    }
    aEnv.env().reinit();

    // A MULTIPLE with fewer fields than its key: the fields present are read.
    body("<Pair><Struct_Pair NumberOfFields = \"1\"><PairB>4</PairB></Struct_Pair></Pair>\n");
    ASSERT_TRUE(aHeader->read(aFile.c_str(), true));
    EXPECT_EQ((*aHeader)["PairB"].getDouble(), 4.0);
    EXPECT_TRUE((*aHeader)["PairA"].isEmpty());
    EXPECT_NE(aEnv.env().trace().find("MULTIPLE Found Fields : 1"), std::string::npos);
}

TEST(StoreXml, UpdateInPlaceKeepsTheFilesOtherSections)
{
    StoreEnv aEnv;
    const fs::path aFile = aEnv.path("upd.sml");
    qtest::writeFile(aFile, std::string(CROOT) +
                                "   <Foreign>\n      <Kept>yes</Kept>\n   </Foreign>\n"
                                "   <StoreSecond>\n      <Count>1</Count>\n      <Note>old</Note>\n   </StoreSecond>\n"
                                "   <Tail/>\n</HEADER_INFO>\n");
    auto aHeader = storetest::makeTestHeader();
    (*aHeader)["StoreSecond.Count"].setValue(2);
    (*aHeader)["StoreTest.IntScalar"].setValue(5);
    ASSERT_TRUE(aHeader->writeXML(aFile.c_str(), false, true));
    EXPECT_EQ(qtest::readFile(aFile),
              std::string(CROOT) +
                  "   <Foreign>\n      <Kept>yes</Kept>\n   </Foreign>\n"
                  "   <StoreSecond>\n      <Count>2</Count>\n   </StoreSecond>\n"
                  "   <Tail/>\n"
                  "   <StoreTest>\n      <IntScalar>5</IntScalar>\n   </StoreTest>\n"
                  "</HEADER_INFO>\n");
    // With a new file, the old content goes.
    ASSERT_TRUE(aHeader->writeXML(aFile.c_str(), true, true));
    EXPECT_EQ(qtest::readFile(aFile).find("Foreign"), std::string::npos);
}

TEST(StoreXml, FailedWriteLeavesTheOldFileAndNoTemporary)
{
    StoreEnv aEnv;
    const fs::path aFile = aEnv.path("atomic.sml");
    auto aHeader = storetest::makeTestHeader();
    (*aHeader)["StoreSecond.Count"].setValue(1);
    ASSERT_TRUE(aHeader->write(aFile.c_str(), true, false));
    const std::string aGood = qtest::readFile(aFile);
    // The temporary name is taken by a directory: the write can't start.
    const fs::path aTemporary = aFile.string() + ".tmp" + std::to_string(static_cast<long>(::getpid()));
    fs::create_directory(aTemporary);
    (*aHeader)["StoreSecond.Count"].setValue(2);
    EXPECT_FALSE(aHeader->write(aFile.c_str(), false, false));
    EXPECT_QORV_FAILURE(aHeader->write(aFile.c_str(), true, false), CQORV_ERR_WRITE_FILE);
    EXPECT_EQ(qtest::readFile(aFile), aGood);
    fs::remove(aTemporary);
    aEnv.env().reinit();
    // The target is a directory: the rename fails and the temporary is removed.
    const fs::path aDir = aEnv.path("dir.sml");
    fs::create_directories(aDir / "inner");
    EXPECT_FALSE(aHeader->writeXML(aDir.c_str(), true, false));
    for (const auto& aEntry : fs::directory_iterator(aEnv.env().work()))
        EXPECT_EQ(aEntry.path().string().find(".tmp"), std::string::npos) << aEntry.path();
    // Missing directories are made.
    EXPECT_TRUE(aHeader->write(aEnv.path("a/b/c/deep_hdr").c_str(), true, false));
    EXPECT_TRUE(fs::exists(aEnv.path("a/b/c/deep.sml")));
}

namespace {
std::string gHookPath;
void recordHook(const char* thePath) { gHookPath = thePath; }
}  // namespace

TEST(StoreXml, WriteDerivesDemCoordinatesSetsSoftwareAndCallsTheEnviHook)
{
    qtest::InProcessEnvironment aEnv;
    auto aHeader = CDescriptionHeader::makeFull();
    CDescriptionHeader& h = *aHeader;
    h["RasterInfo.GeocodedImage"].setValue("OK");
    h["RegistrationCoordinates.LatNorthing"].setValue(46.0);
    h["RegistrationCoordinates.LonEasting"].setValue(11.0);
    h["RegistrationCoordinates.PixelSpacingLatNorth"].setValue(0.001);
    h["RegistrationCoordinates.PixelSpacingLonEast"].setValue(0.002);
    h["RasterInfo.NrOfLinesPerImage"].setValue(101);
    h["RasterInfo.NrOfPixelsPerLine"].setValue(51);
    const QorvHeaderWrittenHook aOld = fqorvSetEnviHeaderWriter(recordHook);
    gHookPath.clear();
    ASSERT_TRUE(h.write(aEnv.workPath("geo_hdr").c_str(), true, false));
    fqorvSetEnviHeaderWriter(aOld);
    EXPECT_EQ(gHookPath, aEnv.workPath("geo_hdr").string());
    EXPECT_DOUBLE_EQ(h["NorthingGridSize"].getDouble(), -0.001);
    EXPECT_DOUBLE_EQ(h["NorthingCoordinateEnd"].getDouble(), 46.0 - 0.1);
    EXPECT_DOUBLE_EQ(h["EastingCoordinateEnd"].getDouble(), 11.0 + 0.1);
    std::string aSoftware;
    ASSERT_TRUE(fqorvGetUserKey(h, "SOFTWARE", aSoftware));
    EXPECT_EQ(aSoftware, CQORV_VERSION_TEXT);
    // Not geocoded: no derivation.
    auto aSlant = CDescriptionHeader::makeFull();
    (*aSlant)["RasterInfo.GeocodedImage"].setValue("NotOK");
    ASSERT_TRUE(aSlant->write(aEnv.workPath("slant_hdr").c_str(), true, false));
    EXPECT_TRUE((*aSlant)["NorthingGridSize"].isEmpty());
}

TEST(StoreText, OldTextHeadersAreReadAndWritten)
{
    StoreEnv aEnv;
    auto aHeader = storetest::makeTestHeader();
    storetest::fillTestSection(*aHeader);
    // Text beside XML: "x_hdr" in text, "x.sml" in XML.
    ASSERT_TRUE(aHeader->write(aEnv.path("t_hdr").c_str(), true, true));
    expectGolden(aEnv.path("t_hdr"), "all_types_text_hdr");
    fs::remove(aEnv.path("t.sml"));
    auto aBack = storetest::makeTestHeader();
    ASSERT_TRUE(aBack->read(aEnv.path("t_hdr").c_str(), true));
    EXPECT_STREQ((*aBack)["StoreTest.StrVector"].getString(1), "");  // the text form writes unset as ""
    (*aBack)["StoreTest.StrVector"].setValue(1, "\"\"");
    // A quoted text ends at its first inner quote: the text form can't hold double quotes.
    EXPECT_STREQ((*aBack)["StoreTest.StrScalar"].getString(), "a&b <c> ");
    (*aBack)["StoreTest.StrScalar"].setValue("a&b <c> \"d\" 'e'");
    expectTestSectionValues(*aBack);

    // A hand-written old file: comments, blanks, a header in the second column, unknown names.
    const fs::path aOld = aEnv.path("old_hdr");
    qtest::writeFile(aOld, "; written long ago\n[StoreTest]\nIntScalar = 12 ; twelve\nDblVector = { 1.5  NaN 2 }\n"
                           "StrScalar = \"two words; and more\"\nUnknown = 1\nIntMatrix = {{1 2} {3 4} {5 6}}\n"
                           "StrMatrix = {\"a b\" c}\n\n [StoreSecond]\nNote = word rest\n");
    ASSERT_TRUE(aBack->read(aOld.c_str(), true));
    EXPECT_EQ((*aBack)["IntScalar"].getInteger(), 12);
    EXPECT_TRUE(std::isnan((*aBack)["DblVector"].getDouble(1)));
    EXPECT_STREQ((*aBack)["StrScalar"].getString(), "two words; and more");
    EXPECT_EQ((*aBack)["IntMatrix"].getNbrOfRows(), 3);
    EXPECT_EQ((*aBack)["IntMatrix"].getInteger(2, 1), 6);
    EXPECT_STREQ((*aBack)["StrMatrix"].getString(0, 0), "a b");
    EXPECT_STREQ((*aBack)["Note"].getString(), "word");
    EXPECT_TRUE((*aBack)["DblScalar"].isEmpty());

    // Rewriting keeps the lines before the first section and replaces the sections in place.
    (*aBack)["Note"].setValue("new");
    ASSERT_TRUE(aBack->writeText(aOld.c_str(), true));
    const std::string aText = qtest::readFile(aOld);
    EXPECT_EQ(aText.rfind("; written long ago\n[StoreTest]\n", 0), 0u);
    EXPECT_NE(aText.find("[StoreSecond]\nNote = \"new\"\n"), std::string::npos);
    EXPECT_EQ(aText.find("Unknown"), std::string::npos);

    // Wrong structure, and a missing section.
    qtest::writeFile(aOld, "[StoreTest]\nIntVector = 3\n[StoreSecond]\n");
    EXPECT_QORV_FAILURE(aBack->read(aOld.c_str(), false), CQORV_ERR_FIELD_TYPE);
    qtest::writeFile(aOld, "[StoreTest]\nIntScalar = {3}\n[StoreSecond]\n");
    EXPECT_QORV_FAILURE(aBack->read(aOld.c_str(), false), CQORV_ERR_FIELD_TYPE);
    qtest::writeFile(aOld, "[StoreTest]\nIntScalar = 3\n");
    EXPECT_FALSE(aBack->read(aOld.c_str(), false));
    EXPECT_QORV_FAILURE(aBack->read(aOld.c_str(), true), CQORV_ERR_MISSING_FILE);
}
