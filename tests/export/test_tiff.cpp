// Steps 7 and 8: the TIFF read back by GDAL (a test-only reader), failures, and one run of the driver.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <filesystem>
#include <sstream>

#include "export_test_util.h"
#include "qorv_image_stats.h"
#include "qorv_raster_to_geotiff.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

/// Output of a shell command.
std::string shell(const std::string& theCommand)
{
    std::string aOut;
    FILE* p = ::popen((theCommand + " 2>&1").c_str(), "r");
    char b[4096];
    while (p && std::fgets(b, sizeof b, p)) aOut += b;
    if (p) ::pclose(p);
    return aOut;
}

/// Pixels of a one-band TIFF by GDAL, row by row.
std::vector<int> gdalPixels(const fs::path& theTiff, const fs::path& theXyz)
{
    shell("gdal_translate -q -of XYZ " + theTiff.string() + " " + theXyz.string());
    std::vector<int> aValues;
    std::istringstream in(qtest::readFile(theXyz));
    double x, y, v;
    while (in >> x >> y >> v) aValues.push_back(static_cast<int>(v));
    return aValues;
}

int runStep(std::vector<std::string> theArgs)
{
    std::vector<char*> v;
    for (auto& s : theArgs) v.push_back(s.data());
    return qorv_raster_to_geotiff(static_cast<int>(v.size()), v.data());
}

TEST(TiffOutput, PowerImageAutomaticWindowReadByGdal)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aIn = aEnv.workPath("x_pwr"), aOut = aIn + ".tif";
    // 100 x 300 power image: automatic window 1 x 3, 100 x 100 output. Power 4 everywhere but a
    // null block (byte 0) and one hot pixel (byte 255); the mean amplitude is 2.
    etest::writeRaster(aIn, 100, 300, "FLOAT", "POWER", [](int r, int c) {
        if (r < 2 && c < 3) return fcomplex(-9999.0f, 0);
        if (r == 10 && c >= 150 && c < 153) return fcomplex(1.0e6f, 0);
        return fcomplex(4.0f, 0);
    });
    ASSERT_EQ(runStep({"multi look to tiff conversion", aIn, aOut, "0.333"}), 0);
    ASSERT_TRUE(fs::exists(aOut));
    EXPECT_FALSE(fs::exists(aOut + ".part"));
    const std::string aInfo = shell("gdalinfo " + aOut);
    EXPECT_NE(aInfo.find("Size is 100, 100"), std::string::npos) << aInfo;
    EXPECT_NE(aInfo.find("Type=Byte"), std::string::npos) << aInfo;
    const auto aPix = gdalPixels(aOut, aEnv.workPath("x.xyz"));
    ASSERT_EQ(aPix.size(), 10000u);
    EXPECT_EQ(aPix[0], 0);
    // int(sqrt(4) x 254 x 0.333 / 2) + 1 = 85.
    EXPECT_EQ(aPix[5 * 100 + 7], static_cast<int>(254 * 0.333) + 1);
    EXPECT_EQ(aPix[10 * 100 + 50], 255);

    std::unique_ptr<CDescriptionHeader> h = CDescriptionHeader::makeFull();
    ASSERT_TRUE(h->read((aOut + "_hdr").c_str(), true));
    EXPECT_STREQ((*h)["RasterInfo.CellType"].getString(), "UNSIGNED_BYTE");
    EXPECT_EQ((*h)["RasterInfo.TiffColScale"].getInteger(), 3);
    EXPECT_EQ((*h)["RasterInfo.TiffRowScale"].getInteger(), 1);
    EXPECT_STREQ((*h)["RasterInfo.TiffColsInvert"].getString(), "NotOK");

    // 301 x 100 with a fixed window: the last line is dropped; rows inverted put row 300 first.
    const std::string aTall = aEnv.workPath("t_slc");
    etest::writeRaster(aTall, 301, 100, "FLOAT_COMPLEX", "SLC",
                       [](int r, int) { return fcomplex(r < 4 ? 8.0f : 2.0f, 0); });
    EXPECT_EQ(fqorvTiffWindow(301, 100, -1, -1).mRowWin, 4);
    ASSERT_EQ(runStep({"slc to tiff conversion", aTall, aTall + ".tif", "0.333", "4", "1", "-1", "-1", "0", "NotOK", "OK"}), 0);
    const auto aTallPix = gdalPixels(aTall + ".tif", aEnv.workPath("t.xyz"));
    ASSERT_EQ(aTallPix.size(), 7500u);
    EXPECT_EQ(aTallPix.back(), 255);    // rows 3..0, read last, hold 8: four times the mean
    EXPECT_EQ(aTallPix.front(), static_cast<int>(254 * 0.333) + 1);
}

TEST(TiffOutput, GeocodedHeaderGivesGeoKeysThatGdalReads)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aIn = aEnv.workPath("g_pwr");
    etest::writeRaster(aIn, 20, 20, "FLOAT", "POWER", [](int r, int c) { return fcomplex(1.0f + r, 0); });
    auto h = CDescriptionHeader::makeFull();
    ASSERT_TRUE(h->read(aIn.c_str(), true));
    (*h)["RasterInfo.GeocodedImage"].setValue("OK");
    (*h)["CartographicSystem.State"].setValue("GEO-GLOBAL");
    (*h)["RegistrationCoordinates.LonEasting"].setValue(12.5);
    (*h)["RegistrationCoordinates.LatNorthing"].setValue(41.75);
    (*h)["RegistrationCoordinates.PixelSpacingLonEast"].setValue(0.001);
    (*h)["RegistrationCoordinates.PixelSpacingLatNorth"].setValue(-0.001);
    ASSERT_TRUE(h->write((aIn + "_hdr").c_str(), true, false));
    ASSERT_EQ(runStep({"multi look to tiff conversion", aIn, aIn + ".tif", "0.333", "2", "2"}), 0);
    const std::string aInfo = shell("gdalinfo " + aIn + ".tif");
    EXPECT_NE(aInfo.find("Size is 10, 10"), std::string::npos) << aInfo;
    EXPECT_NE(aInfo.find("WGS 84"), std::string::npos) << aInfo;
    EXPECT_NE(aInfo.find("Origin = (12.500000000000000,41.750000000000000)"), std::string::npos) << aInfo;
    EXPECT_NE(aInfo.find("Pixel Size = (0.002000000000000,-0.002000000000000)"), std::string::npos) << aInfo;
}

TEST(TiffOutput, BadInputsFailWithTheirIdsAndLeaveNoTiff)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aNull = aEnv.workPath("n_pwr");
    etest::writeRaster(aNull, 10, 10, "FLOAT", "POWER", [](int, int) { return fcomplex(-9999.0f, 0); });
    EXPECT_QORV_FAILURE(runStep({"t", aNull, aNull + ".tif"}), 261126);
    aEnv.reinit();
    EXPECT_QORV_FAILURE(runStep({"t", aEnv.workPath("absent_pwr"), aNull + ".tif"}), 261122);
    aEnv.reinit();
    fs::remove(aNull);  // the header stays, the raster is gone
    EXPECT_QORV_FAILURE(runStep({"t", aNull, aNull + ".tif"}), 848641);
    aEnv.reinit();
    EXPECT_QORV_FAILURE(runStep({"t", aNull}), 130560);
    aEnv.reinit();
    const std::string aGood = aEnv.workPath("ok_pwr");
    etest::writeRaster(aGood, 10, 10, "FLOAT", "POWER", [](int, int) { return fcomplex(1.0f, 0); });
    EXPECT_QORV_FAILURE(runStep({"t", aGood, aEnv.workPath("no_dir/ok_pwr.tif")}), 261123);
    for (const auto& e : fs::directory_iterator(aEnv.work()))
        EXPECT_EQ(e.path().string().find(".tif"), std::string::npos) << e.path();
}

TEST(TiffOutput, SlcToTiffRunsThroughTheDriver)
{
    qtest::DriverSandbox aBox;
    const auto aSlc = aBox.data() / "x_slc";
    {
        qtest::InProcessEnvironment aEnv;
        etest::writeRaster(aSlc.string(), 40, 30, "FLOAT_COMPLEX", "SLC",
                           [](int r, int c) { return std::polar(1.0f + (r + c) % 3, 0.3f * c); });
        auto h = CDescriptionHeader::makeFull();
        ASSERT_TRUE(h->read(aSlc.c_str(), true));
        (*h)["Sensor.SensorName"].setValue("ENVISAT-1");  // the driver's PRF scan leaves it alone
        ASSERT_TRUE(h->write((aSlc.string() + "_hdr").c_str(), true, false));
    }
    auto aArgs = qtest::DriverSandbox::defaultArguments(aSlc, aBox.data() / "x_pwr");
    aArgs[1] = "NotOK";  // no focusing, no multi-look: step 8 alone
    aArgs[6] = "OK";
    aArgs[14] = "OK";
    const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs));
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr << aBox.trace();
    const std::string aInfo = shell("gdalinfo " + aSlc.string() + ".tif");
    EXPECT_NE(aInfo.find("Size is 30, 40"), std::string::npos) << aInfo;
    EXPECT_NE(aBox.trace().find("slc to tiff conversion"), std::string::npos);
}

}  // namespace
