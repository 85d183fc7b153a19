// ENVI headers beside the rasters: the text byte for byte, the names that get none, and a real
// outside reader (GDAL) opening our products through them.
#include <array>
#include <cmath>
#include <cstdio>
#include <memory>

#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_envi_util.h"
#include "qorv_errors.h"
#include "qorv_json.h"
#include "qorvex_test_support.h"
#include "raster_test_util.h"
#include "tools_raster_file_exp.h"

using namespace rtest;

namespace {

class EnviTest : public ::testing::Test {
protected:
    explicit EnviTest(const qtest::ConfigOptions& theOptions = {}) : mEnv(theOptions) { fqorvRegisterEnviHeaderWriter(); }
    ~EnviTest() override { fqorvSetEnviHeaderWriter(nullptr); }

    std::string path(const std::string& theName) const { return mEnv.workPath(theName).string(); }

    /// A 21-section header of a raster.
    static std::unique_ptr<CDescriptionHeader> rasterHeader(int theLines, int thePixels, const char* theCellType,
                                                            const char* theOrder, double theNull)
    {
        std::unique_ptr<CDescriptionHeader> h = CDescriptionHeader::makeFull();
        (*h)["RasterInfo.NrOfLinesPerImage"].setValue(theLines);
        (*h)["RasterInfo.NrOfPixelsPerLine"].setValue(thePixels);
        (*h)["RasterInfo.CellType"].setValue(theCellType);
        (*h)["RasterInfo.BytesOrder"].setValue(theOrder);
        (*h)["RasterInfo.HeaderOffset"].setValue(0);
        (*h)["RasterInfo.RowPrefix"].setValue(0);
        (*h)["RasterInfo.RowSuffix"].setValue(0);
        (*h)["RasterInfo.NullCellValue"].setValue(theNull);
        return h;
    }

    qtest::InProcessEnvironment mEnv;
};

}  // namespace

TEST_F(EnviTest, SlantRangeSlcHeaderText)
{
    std::unique_ptr<CDescriptionHeader> h = rasterHeader(3, 5, "FLOAT_COMPLEX", "LSBF", 0.0);
    (*h)["RasterInfo.DataUnits"].setValue("SLC");
    (*h)["Processing.PixelSpacingRg"].setValue(7.9048);
    (*h)["Processing.PixelSpacingAz"].setValue(4.0);
    (*h)["InitialGeometry.Projection"].setValue("SLANT_RANGE");
    (*h)["ChannelInfo.IncidenceAngle"].setValue(30.0);
    fqorvSetUserKey(*h, "ACQUISITION TIME", "21-MAR-1996 10:15:42.123456");
    ASSERT_TRUE(h->write(path("scene_slc_hdr").c_str(), true, false));

    EXPECT_EQ(qtest::readFile(path("scene_slc.hdr")),
              "ENVI\n"
              "description = {\n"
              "   ACQUISITION TIME = 21-MAR-1996 10:15:42.123456\n"
              "   File generated with Qorvex  4.3.000}\n"
              "samples        = 5\n"
              "lines          = 3\n"
              "bands          = 1\n"
              "header offset  = 0\n"
              "file type      = ENVI Standard\n"
              "data type      = 6\n"
              "sensor type    = Unknown\n"
              "interleave     = bsq\n"
              "byte order     = 0\n"
              "pixel size = {15.8096, 4, units=Meters}\n"
              "x start        = 1\n"
              "y start        = 1\n"
              "Data Ignore Value = 0\n"
              "complex function = Magnitude\n");
}

// A raw product: two bands of short parts in big-endian order behind its header; the null value is
// the run's dummy, so no ignore value, and no radar spacing or complex function.
TEST_F(EnviTest, RawShortComplexBigEndianHeader)
{
    std::unique_ptr<CDescriptionHeader> h = rasterHeader(10, 20, "SHORT_COMPLEX", "MSBF", -9999.0);
    (*h)["RasterInfo.HeaderOffset"].setValue(720);
    ASSERT_TRUE(h->write(path("raw.sml").c_str(), true, false));
    const std::string aText = qtest::readFile(path("raw.hdr"));
    EXPECT_EQ(aText.rfind("ENVI\ndescription = {\n   File Imported into ENVI.}\n", 0), 0u);
    for (const char* aLine : {"bands          = 2\n", "data type      = 2\n", "byte order     = 1\n", "header offset  = 720\n"})
        EXPECT_NE(aText.find(aLine), std::string::npos) << aLine;
    for (const char* aKey : {"Data Ignore Value", "pixel size", "complex function"})
        EXPECT_EQ(aText.find(aKey), std::string::npos) << aKey;
}

// Every cell type gets its ENVI data type through the index table of the description file.
TEST_F(EnviTest, DataTypeOfEveryCellType)
{
    const char* aExpected[CQORV_CELL_TYPE_NBR] = {"1", "1", "1", "9", "2", "12", "2", "4", "6", "5", "9", "13", "3", "1", "2"};
    for (int t = 0; t < CQORV_CELL_TYPE_NBR; ++t) {
        std::unique_ptr<CDescriptionHeader> h = rasterHeader(1, 1, fqorvCellTypeName(t), "LSBF", -9999.0);
        const std::string aName = path("type_" + std::to_string(t));
        ASSERT_TRUE(h->write((aName + "_hdr").c_str(), true, false));
        EXPECT_NE(qtest::readFile(aName + ".hdr").find(std::string("data type      = ") + aExpected[t] + "\n"),
                  std::string::npos)
            << fqorvCellTypeName(t);
    }
}

TEST_F(EnviTest, NamesThatGetNoFile)
{
    for (const char* aName : {"x_par", "x_par_hdr", "x_par.sml", "x.tif", "x.tif_hdr", "x_orb", "x_orb_hdr", "x.orb",
                              "x_orb.sml", "x.QorvexParameterExtracted"})
        EXPECT_TRUE(fqorvEnviHeaderExcluded(aName)) << aName;
    for (const char* aName : {"x_slc_hdr", "x_slc.sml", "x_rc", "x_pwr_hdr", "x.tiff_hdr"})
        EXPECT_FALSE(fqorvEnviHeaderExcluded(aName)) << aName;
    for (const char* aName : {"/d/x_slc_hdr", "/d/x_slc.sml", "/d/x_slc"}) EXPECT_EQ(fqorvEnviHeaderName(aName), "/d/x_slc.hdr");

    std::unique_ptr<CDescriptionHeader> h = rasterHeader(1, 1, "FLOAT", "LSBF", 0.0);
    ASSERT_TRUE(h->write(path("x_par").c_str(), true, false));
    EXPECT_FALSE(qtest::fs::exists(path("x_par.hdr")));
    EXPECT_NE(mEnv.trace().find(" writeRasterHeaderEnvi NO CREATE ENVI .hdr for : "), std::string::npos);

    // A header whose "RowPrefix" holds no value describes no flat raster.
    h->getField("RasterInfo.RowPrefix").reset();
    ASSERT_TRUE(h->write(path("noprefix_hdr").c_str(), true, false));
    EXPECT_FALSE(qtest::fs::exists(path("noprefix.hdr")));
    EXPECT_NE(mEnv.trace().find("NOT FOUND : "), std::string::npos);
}

TEST_F(EnviTest, GeocodedAndUnitLines)
{
    std::unique_ptr<CDescriptionHeader> h = rasterHeader(4, 4, "FLOAT", "LSBF", -1.0);
    (*h)["RasterInfo.GeocodedImage"].setValue("OK");
    (*h)["CartographicSystem.State"].setValue("UTM-GLOBAL");
    (*h)["CartographicSystem.Zone"].setValue(32);
    (*h)["CartographicSystem.Hemisphere"].setValue("SOUTH");
    (*h)["RegistrationCoordinates.LonEasting"].setValue(500000.0);
    (*h)["RegistrationCoordinates.LatNorthing"].setValue(5000000.0);
    (*h)["RegistrationCoordinates.PixelSpacingLonEast"].setValue(12.5);
    (*h)["RegistrationCoordinates.PixelSpacingLatNorth"].setValue(12.5);
    (*h)["Processing.PixelSpacingRg"].setValue(7.9);
    (*h)["Processing.PixelSpacingAz"].setValue(4.0);
    (*h)["InitialGeometry.Projection"].setValue("GROUND_RANGE");
    (*h)["RasterInfo.DataUnits"].setValue("INTERFEROGRAMME");
    ASSERT_TRUE(h->write(path("geo_hdr").c_str(), true, false));
    std::string aText = qtest::readFile(path("geo.hdr"));
    EXPECT_NE(aText.find("map info = {UTM, 1, 1, 500000, 5000000, 12.5, 12.5,\n 32, South, WGS-84, units=Meters }\n"),
              std::string::npos)
        << aText;
    EXPECT_EQ(aText.find("pixel size"), std::string::npos);  // geocoded: no radar spacing
    EXPECT_NE(aText.find("Data Ignore Value = -1\n"), std::string::npos);
    EXPECT_NE(aText.find("complex function = Phase\n"), std::string::npos);

    // A ground range image tells its spacing as it stands; a classification its classes.
    (*h)["RasterInfo.GeocodedImage"].setValue("NotOK");
    (*h)["RasterInfo.DataUnits"].setValue("CLASSIFICATION");
    (*h)["RasterInfo.ClassificationName"].resize(1, 2);
    (*h)["RasterInfo.ClassificationName"].setValue(0, "water");
    (*h)["RasterInfo.ClassificationName"].setValue(1, "urban");
    for (const char* aLut : {"RasterInfo.TiffLUTRed", "RasterInfo.TiffLUTGreen", "RasterInfo.TiffLUTBlue"}) {
        (*h)[aLut].resize(1, 2);
        (*h)[aLut].setValue(0, 0);
        (*h)[aLut].setValue(1, 0);
    }
    (*h)["RasterInfo.TiffLUTBlue"].setValue(0, 65535);
    (*h)["RasterInfo.TiffLUTRed"].setValue(1, 65535);
    ASSERT_TRUE(h->write(path("geo_hdr").c_str(), true, false));
    aText = qtest::readFile(path("geo.hdr"));
    EXPECT_EQ(aText.find("map info"), std::string::npos);
    EXPECT_NE(aText.find("pixel size = {7.9, 4, units=Meters}\n"), std::string::npos);
    EXPECT_NE(aText.find("file type = ENVI Classification\nclasses = 2\nclass lookup = {\n 0, 0, 255, 255, 0, 0}\n"
                         "class names = {\n water, urban}\n"),
              std::string::npos)
        << aText;
}

// Without the ENVI description file the product header is written and the ENVI one is not.
class EnviNoDescriptionTest : public EnviTest {
protected:
    static qtest::ConfigOptions withoutDescriptionFile()
    {
        static qtest::TempDir sDes("qorvex-des");
        for (const char* aName : {"qorv_errors_catalog.des", "qorv_warnings_catalog.des"})
            qtest::fs::copy_file(qtest::sourceShareDir() / "des" / aName, sDes.path() / aName, qtest::fs::copy_options::overwrite_existing);
        qtest::ConfigOptions aOptions;
        aOptions.mDesDir = sDes.path();
        return aOptions;
    }
    EnviNoDescriptionTest() : EnviTest(withoutDescriptionFile()) {}
};

TEST_F(EnviNoDescriptionTest, MissingDescriptionFileWritesNothing)
{
    ASSERT_TRUE(rasterHeader(2, 2, "FLOAT", "LSBF", 0.0)->write(path("plain_hdr").c_str(), true, false));
    EXPECT_TRUE(qtest::fs::exists(path("plain.sml")));
    EXPECT_FALSE(qtest::fs::exists(path("plain.hdr")));
    EXPECT_NE(mEnv.trace().find("SEC_FILE_NOT_FOUND : "), std::string::npos);
}

// ------------------------------------------------------------------------------------------------
// GDAL opens our products through their ENVI headers.

namespace {

std::string runCommand(const std::string& theCommand)
{
    std::string aOut;
    FILE* p = ::popen(theCommand.c_str(), "r");
    if (p == nullptr) return aOut;
    std::array<char, 4096> aBuffer;
    std::size_t n;
    while ((n = std::fread(aBuffer.data(), 1, aBuffer.size(), p)) > 0) aOut.append(aBuffer.data(), n);
    ::pclose(p);
    return aOut;
}

bool haveGdal() { return std::system("command -v gdalinfo > /dev/null 2>&1 && command -v gdallocationinfo > /dev/null 2>&1") == 0; }

}  // namespace

TEST_F(EnviTest, GdalReadsOurRasters)
{
    if (!haveGdal()) GTEST_SKIP() << "gdalinfo is not installed";
    const int aLines = 5, aPixels = 7;
    for (const char* aOrder : {"LSBF", "MSBF"}) {
        SCOPED_TRACE(aOrder);
        const std::string aName = path(std::string("gdal_") + aOrder + "_slc");
        std::unique_ptr<CDescriptionHeader> h = rasterHeader(aLines, aPixels, "FLOAT_COMPLEX", aOrder, 0.0);
        CRasterFileParam p;
        fqorvRasterParamFromHeader(*h, aName.c_str(), p);
        CRasterFile w;
        w.openWrite(CQORV_RF_OPEN_WRITE, p);
        std::vector<fcomplex> aLine(aPixels);
        for (int l = 0; l < aLines; ++l) {
            for (int c = 0; c < aPixels; ++c) aLine[c] = fcomplex(float(l * 10 + c) + 0.5f, -float(c + 1));
            fqorvWriteLine(w, aLine.data(), l);
        }
        w.close();
        ASSERT_TRUE(h->write((aName + "_hdr").c_str(), true, false));

        const CJson aInfo = CJson::parse(runCommand("gdalinfo -json '" + aName + "' 2>/dev/null"));
        EXPECT_EQ(aInfo["driverShortName"].string(), "ENVI");
        EXPECT_EQ(aInfo["size"][std::size_t(0)].number(), aPixels);
        EXPECT_EQ(aInfo["size"][std::size_t(1)].number(), aLines);
        ASSERT_EQ(aInfo["bands"].size(), 1u);
        EXPECT_EQ(aInfo["bands"][std::size_t(0)]["type"].string(), "CFloat32");
        EXPECT_EQ(aInfo["bands"][std::size_t(0)]["noDataValue"].number(), 0.0);

        // Pixel (column 3, line 2) and the last one, as GDAL reads them.
        for (auto [c, l] : {std::pair{3, 2}, std::pair{aPixels - 1, aLines - 1}}) {
            const std::string aValue = runCommand("gdallocationinfo -valonly '" + aName + "' " + std::to_string(c) + " " +
                                                  std::to_string(l) + " 2>/dev/null");
            double re = 0, im = 0;
            ASSERT_EQ(std::sscanf(aValue.c_str(), "%lf+%lfi", &re, &im), 2) << aValue;
            EXPECT_EQ(re, double(l * 10 + c) + 0.5) << aValue;
            EXPECT_EQ(im, -double(c + 1)) << aValue;
        }
    }
}
