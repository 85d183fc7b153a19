// Multi-look: the suggested looks rule, the averaging kernels against closed forms, step 6 and the
// subaperture multi-look on small synthetic SLCs, and step 6 through the driver program.
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <memory>
#include <utility>
#include <string>
#include <vector>

#include "qorv_AzSubaperture_multi_SLC.h"
#include "qorv_description_section.h"
#include "qorv_multi_SLC.h"
#include "qorv_multilook_kernel.h"
#include "qorv_raster_file.h"
#include "tools_raster_file_exp.h"
#include "qorvex_test_support.h"

namespace fs = std::filesystem;

namespace {

constexpr double kDeg = M_PI / 180.0;

/// Sample (col + 1, line) of the synthetic SLC: power (col + 1)^2 + line^2, separable in a rectangle.
fcomplex rampSample(int theLine, int theCol) { return fcomplex(theCol + 1.0f, static_cast<float>(theLine)); }

/// Mean of (c + 1)^2 over n columns from c0 plus the mean of l^2 over m lines from l0.
double rampMean(int c0, int n, int l0, int m)
{
    double aCols = 0.0, aLines = 0.0;
    for (int c = c0; c < c0 + n; ++c) aCols += (c + 1.0) * (c + 1.0);
    for (int l = l0; l < l0 + m; ++l) aLines += static_cast<double>(l) * l;
    return aCols / n + aLines / m;
}

/// Writes an SLC "<theName>" of theLines x theWidth ramp samples (image lines) and its header.
void writeSlc(const std::string& theName, int theLines, int theWidth, const char* theCellType = "FLOAT_COMPLEX",
              const char* theLinesDirection = "INCREASE TIME DIRECTION")
{
    auto h = CDescriptionHeader::makeFull();
    CDescriptionHeader& aHeader = *h;
    for (auto [aKey, aText] : {std::pair{"SensorName", "ERS-2"}, {"AzimuthStartTime", "21-MAR-1996 10:15:42.123456"},
                               {"CellType", theCellType}, {"DataUnits", "SLC"}, {"BytesOrder", "LSBF"},
                               {"TimeDirectionLines", theLinesDirection}})
        aHeader[aKey].setValue(aText);
    for (auto [aKey, aValue] : {std::pair{"NrOfPixelsPerLine", theWidth}, {"NrOfLinesPerImage", theLines}, {"HeaderOffset", 0},
                                {"RowPrefix", 0}, {"RowSuffix", 0}, {"NAzimuthLooks", 1}, {"NRangeLooks", 1}})
        aHeader[aKey].setValue(aValue);
    for (auto [aKey, aValue] : {std::pair{"NullCellValue", -9999.0}, {"PixelSpacingRg", 7.9}, {"PixelSpacingAz", 4.0},
                                {"ResolutionAzimuth", 5.0}, {"IncidenceAngle", 23.0}})
        aHeader[aKey].setValue(aValue);
    aHeader["ChannelInfo.Description"].resize(1, 1);
    aHeader["ChannelInfo.Description"].setValue(0, "VV");  // step 0 names the channel by it
    fqorvSetUserKey(aHeader, "ORIGIN DATA", "ers_slc");
    ASSERT_TRUE(aHeader.write((theName + ".sml").c_str(), true, false));

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(aHeader, theName.c_str(), aParam);
    CRasterFile aRaster;
    aRaster.openWrite(CQORV_RF_OPEN_WRITE, aParam);
    std::vector<fcomplex> aLine(static_cast<std::size_t>(theWidth));
    for (int l = 0; l < theLines; ++l) {
        for (int c = 0; c < theWidth; ++c) aLine[c] = rampSample(l, c);
        fqorvWriteLine(aRaster, aLine.data(), l);  // a real cell takes the power
    }
    aRaster.close();
}

/// Reads a FLOAT raster of a header written by a step.
std::vector<float> readMli(const std::string& theName, const CDescriptionHeader& theHeader)
{
    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(theHeader, theName.c_str(), aParam);
    CRasterFile aRaster;
    aRaster.openRead(aParam);
    std::vector<float> aData(static_cast<std::size_t>(aParam.mNrOfLinesPerImage) * aParam.mNrOfPixelsPerLine);
    aRaster.readLines(0, aParam.mNrOfLinesPerImage, 0, aParam.mNrOfPixelsPerLine - 1, aData.data());
    return aData;
}

std::unique_ptr<CDescriptionHeader> readHeader(const std::string& theName)
{
    auto aHeader = CDescriptionHeader::makeFull();
    EXPECT_TRUE(aHeader->read((theName + "_hdr").c_str(), true)) << theName;
    return aHeader;
}

int runStep(int (*theStep)(int, char**), std::vector<std::string> theArgs)
{
    std::vector<char*> aArgv;
    for (std::string& a : theArgs) aArgv.push_back(a.data());
    return theStep(static_cast<int>(aArgv.size()), aArgv.data());
}

std::string userKey(const CDescriptionHeader& theHeader, const char* theKey)
{
    std::string aValue;
    EXPECT_TRUE(fqorvGetUserKey(theHeader, theKey, aValue)) << theKey;
    return aValue;
}

}  // namespace

TEST(SuggestedLooks, SquareGroundPixelFromSlantSpacingAndIncidence)
{
    int rl = 0, al = 0;
    double gr = 0.0, ga = 0.0;
    // ERS: 7.9 m slant range at 23 deg is 20.22 m on the ground, against 4.0 m in azimuth.
    ASSERT_TRUE(fqorvSuggestedLooks(7.9, 4.0, 23.0, 90.0, rl, al, gr, ga));
    EXPECT_EQ(rl, 1);
    EXPECT_EQ(al, 5);  // trunc(20.22 / 4.0)
    EXPECT_NEAR(gr, 7.9 / std::sin(23.0 * kDeg), 1e-12);
    EXPECT_NEAR(ga, 20.0, 1e-12);
    // Azimuth the coarser: looks go to range, 10 / (2 / sin 30) = 2.5 -> 2.
    ASSERT_TRUE(fqorvSuggestedLooks(2.0, 10.0, 30.0, 90.0, rl, al, gr, ga));
    EXPECT_EQ(rl, 2);
    EXPECT_EQ(al, 1);
    EXPECT_NEAR(gr, 8.0, 1e-12);
    EXPECT_NEAR(ga, 10.0, 1e-12);
    // No ground spacing: nothing is answered and the outputs stay.
    rl = al = 7;
    EXPECT_FALSE(fqorvSuggestedLooks(0.0, 4.0, 23.0, 90.0, rl, al, gr, ga));
    EXPECT_FALSE(fqorvSuggestedLooks(7.9, 4.0, 0.0, 90.0, rl, al, gr, ga));
    EXPECT_FALSE(fqorvSuggestedLooks(7.9, std::nan(""), 23.0, 90.0, rl, al, gr, ga));
    EXPECT_EQ(rl, 7);
    EXPECT_EQ(al, 7);
}

TEST(MultiLookKernel, MeanPowerOfRectanglesWithNullsLeftOut)
{
    const double aNull = -9999.0;
    const float aOutNull = -1.0f;
    // Ramp power p(c) = c over 10 columns, 3 range looks: column 9 is beyond 3 * 3 and ignored.
    CMultiLookAverager aRamp(10, 3, aNull, aOutNull);
    std::vector<double> aLine(10);
    for (int c = 0; c < 10; ++c) aLine[c] = c;
    aLine[9] = 1e30;
    aRamp.addLine(aLine.data());
    aRamp.addLine(aLine.data());
    std::vector<float> aOut(3);
    aRamp.takeLine(aOut.data());
    for (int x = 0; x < 3; ++x) EXPECT_FLOAT_EQ(aOut[x], 3.0f * x + 1.0f);  // mean of 3x, 3x+1, 3x+2

    // Nulls leave the count; an all-null rectangle gives the output null, never 0; NaN is a value.
    CMultiLookAverager aNulls(6, 2, aNull, aOutNull);
    const double aFirst[] = {4.0, aNull, aNull, aNull, std::nan(""), 1.0};
    const double aSecond[] = {8.0, 6.0, aNull, aNull, 1.0, 1.0};
    aNulls.addLine(aFirst);
    aNulls.addLine(aSecond);
    aNulls.takeLine(aOut.data());
    EXPECT_FLOAT_EQ(aOut[0], 6.0f);
    EXPECT_FLOAT_EQ(aOut[1], aOutNull);
    EXPECT_TRUE(std::isnan(aOut[2]));
    // The sums start anew after each output line.
    const double aThird[] = {2.0, 2.0, 3.0, 3.0, 5.0, 5.0};
    aNulls.addLine(aThird);
    aNulls.takeLine(aOut.data());
    EXPECT_FLOAT_EQ(aOut[0], 2.0f);
    EXPECT_FLOAT_EQ(aOut[1], 3.0f);
    EXPECT_FLOAT_EQ(aOut[2], 5.0f);
}

TEST(MultiLookKernel, SubapertureRectanglesAndTheZeroRule)
{
    // 2 azimuth looks, 8 columns, 2 range looks: centres 1, 3, 5 (5 < 8 - 1); pixel 3 has no rectangle.
    const int W = 8;
    std::vector<fcomplex> aRows(2 * W, fcomplex(2.0f, 0.0f));  // power 4
    for (int c = 0; c < W; ++c) aRows[c] = fcomplex(0.0f, static_cast<float>(c));  // row 0: power c^2
    std::vector<float> aMli(4, 0.0f);
    fqorvSubapertureLookLine(aRows.data(), 2, W, 2, 0, 2, aMli.data());
    for (int p = 0; p < 3; ++p) {
        const double c0 = 2.0 * p;  // columns c0, c0 + 1
        EXPECT_FLOAT_EQ(aMli[p], static_cast<float>((c0 * c0 + (c0 + 1) * (c0 + 1) + 8.0) / 8.0)) << p;
    }
    EXPECT_EQ(aMli[3], 0.0f);
    // The second subaperture adds its share; an empty rectangle in it empties the pixel.
    std::vector<float> aFirst = aMli;
    for (int c = 0; c < 2; ++c) aRows[c] = aRows[W + c] = fcomplex(0.0f, 0.0f);
    fqorvSubapertureLookLine(aRows.data(), 2, W, 2, 1, 2, aMli.data());
    EXPECT_EQ(aMli[0], 0.0f);
    EXPECT_FLOAT_EQ(aMli[1], aFirst[1] + aFirst[1]);  // both subapertures hold the same samples there
    // An odd look count centres the rectangle: 3 columns around centre 1, 4 and 7 of 9.
    std::vector<fcomplex> aOdd(9);
    for (int c = 0; c < 9; ++c) aOdd[c] = fcomplex(static_cast<float>(c), 0.0f);
    std::vector<float> aOddMli(3, 0.0f);
    fqorvSubapertureLookLine(aOdd.data(), 1, 9, 3, 0, 1, aOddMli.data());
    for (int p = 0; p < 3; ++p) EXPECT_FLOAT_EQ(aOddMli[p], static_cast<float>(rampMean(3 * p - 1, 3, 0, 1))) << p;
}

TEST(MultiLookStep, MeansHeaderAndUserKeysOfAnSlc)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aSlc = aEnv.workPath("scene_slc").string();
    const std::string aMli = aEnv.workPath("scene_pwr").string();
    writeSlc(aSlc, 7, 10);
    {  // inertial state vectors, which the step turns to the Earth-fixed frame
        auto h = readHeader(aSlc);
        (*h)["nStateVectors"].setValue(2);
        (*h)["TimeFirst"].setValue("21-MAR-1996 10:15:00.000000");
        (*h)["TimeDelta"].setValue(60.0);
        for (const char* aKey : {"pos_x", "pos_y", "pos_z"}) (*h)[aKey].resize(1, 2);
        for (int i = 0; i < 2; ++i) (*h)["pos_x"].setValue(i, 7.0e6), (*h)["pos_y"].setValue(i, 1.0e6 * i), (*h)["pos_z"].setValue(i, 1.0e5);
        (*h)["ChannelInfo.PRF"].resize(1, 1);
        (*h)["ChannelInfo.PRF"].setValue(0, 1680.0);
        (*h)["MeanAltitude"].setValue(780000.0);
        (*h)["StateVectorReference"].setValue("IRS");
        ASSERT_TRUE(h->write((aSlc + ".sml").c_str(), true, false));
    }
    // Looks as text of real numbers; line 6 and column 9 lie beyond the last full rectangle.
    ASSERT_EQ(runStep(qorv_multi_SLC, {"multi look", aSlc, aMli, "NotOK", "3.000000", "2", "0", "NotOK", "NotOK", "NotOK"}), 0);
    EXPECT_FALSE(fs::exists(aMli + "_tmp"));
    auto h = readHeader(aMli);
    const CDescriptionHeader& aOut = *h;
    ASSERT_EQ(aOut["NrOfPixelsPerLine"].getInteger(), 3);
    ASSERT_EQ(aOut["NrOfLinesPerImage"].getInteger(), 3);
    const std::vector<float> aData = readMli(aMli, aOut);
    for (int y = 0; y < 3; ++y)
        for (int x = 0; x < 3; ++x)
            EXPECT_NEAR(aData[3 * y + x], rampMean(3 * x, 3, 2 * y, 2), 1e-4) << y << " " << x;

    EXPECT_EQ(aOut["Processing.NRangeLooks"].getInteger(), 3);
    EXPECT_DOUBLE_EQ(aOut["PixelSpacingRg"].getDouble(), 3 * 7.9);
    EXPECT_DOUBLE_EQ(aOut["ResolutionAzimuth"].getDouble(), 10.0);
    EXPECT_TRUE(aOut["ResolutionRange"].isEmpty());
    EXPECT_STREQ(aOut["DataUnits"].getString(), "POWER");
    EXPECT_EQ(userKey(aOut, "LOOKS RANGE NUMBER"), "3");
    EXPECT_EQ(userKey(aOut, "LOOKS AZIMUTH NUMBER"), "2");
    EXPECT_EQ(userKey(aOut, "SCENE DATA"), "ERS-2 ers_slc");
    EXPECT_EQ(userKey(aOut, "ACQUISITION TIME"), "21-MAR-1996 10:15:42.123456");
    EXPECT_STREQ(aOut["StateVectorReference"].getString(), "ECR");
    EXPECT_NE(aOut["pos_x"].getDouble(1), 7.0e6);  // rotated about z: the distance from the axis stays
    EXPECT_NEAR(std::hypot(aOut["pos_x"].getDouble(1), aOut["pos_y"].getDouble(1)), std::hypot(7.0e6, 1.0e6), 1e-6);
    EXPECT_EQ(aOut["pos_z"].getDouble(1), 1.0e5);
    EXPECT_NE(aEnv.trace().find("*** VDQ SAR SLC --> MULTILOOK INTENSITY IMAGE v2.4 29-oct-99 xq ***"), std::string::npos);

    // Zero looks take the header's suggestion; a second multi-look multiplies the look counts.
    (*h)["SuggestedRangeLooks"].setValue(1);
    (*h)["SuggestedAzimuthLooks"].setValue(3);
    ASSERT_TRUE(h->write((aMli + ".sml").c_str(), true, false));
    const std::string aTwice = aEnv.workPath("twice_pwr").string();
    ASSERT_EQ(runStep(qorv_multi_SLC, {"multi look", aMli, aTwice, "NotOK", "0", "0", "0", "NotOK", "NotOK", "NotOK"}), 0);
    auto h2 = readHeader(aTwice);
    EXPECT_EQ((*h2)["Processing.NRangeLooks"].getInteger(), 3);
    EXPECT_EQ((*h2)["Processing.NAzimuthLooks"].getInteger(), 6);
    EXPECT_EQ((*h2)["FromInImageRangeLooks"].getInteger(), 3);
    EXPECT_EQ((*h2)["FromInImageAzimuthLooks"].getInteger(), 6);
    EXPECT_NEAR(readMli(aTwice, *h2)[1], rampMean(3, 3, 0, 6), 1e-3);
    // Without a suggestion the rule runs on the header file: 23.7 m slant range at 23 deg against
    // 8 m in azimuth gives 1 x trunc(60.66 / 8) = 1 x 7.
    int rl = 0, al = 0;
    double gr = 0.0, ga = 0.0;
    ASSERT_EQ(fqorvSuggestedLooksFromFile(aMli.c_str(), rl, al, gr, ga), 1);
    EXPECT_EQ(rl, 1);
    EXPECT_EQ(al, 7);
    EXPECT_EQ(fqorvSuggestedLooksFromFile(aEnv.workPath("nothing").c_str(), rl, al, gr, ga), -1);
}

TEST(MultiLookStep, LinesInDecreasingTimeKeepTheFileOrderOfTheSlc)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aSlc = aEnv.workPath("down_slc").string();
    const std::string aMli = aEnv.workPath("down_pwr").string();
    writeSlc(aSlc, 7, 3, "FLOAT_COMPLEX", "DECREASE TIME DIRECTION");  // file line 0 is image line 6
    ASSERT_TRUE(fqorvMultiLookImage(aSlc.c_str(), aMli.c_str(), 2.0, 1.0, false, false, "NotOK", "NotOK"));
    // Image line 6 is left over; file line 0 of the MLI is its last line, from image lines 4 and 5.
    const std::vector<float> aData = readMli(aMli, *readHeader(aMli));
    for (int y = 0; y < 3; ++y) EXPECT_NEAR(aData[3 * y], rampMean(0, 1, 4 - 2 * y, 2), 1e-4) << y;
}

TEST(MultiLookStep, BadInputFailsWithItsIdAndLeavesNoProduct)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aMli = aEnv.workPath("x_pwr").string();
    EXPECT_QORV_FAILURE(runStep(qorv_multi_SLC, {"multi look", "a", "b", "NotOK"}), 456962);
    aEnv.reinit();
    EXPECT_QORV_FAILURE(runStep(qorv_multi_SLC, {"multi look", aEnv.workPath("none_slc").string(), aMli, "NotOK",
                                                 "1", "1", "0", "NotOK", "NotOK", "NotOK"}),
                        261122);
    EXPECT_NE(aEnv.trace().find("Error: missing parameter file "), std::string::npos);
    // A header whose raster is missing.
    aEnv.reinit();
    const std::string aSlc = aEnv.workPath("lost_slc").string();
    writeSlc(aSlc, 4, 4);
    fs::remove(aSlc);
    EXPECT_QORV_FAILURE(runStep(qorv_multi_SLC, {"multi look", aSlc, aMli, "NotOK", "1", "1", "0", "NotOK", "NotOK", "NotOK"}),
                        261122);
    EXPECT_FALSE(fs::exists(aMli));
    EXPECT_FALSE(fs::exists(aMli + ".sml"));
    // More looks than the image has lines.
    aEnv.reinit();
    writeSlc(aSlc, 4, 4);
    EXPECT_QORV_FAILURE(runStep(qorv_multi_SLC, {"multi look", aSlc, aMli, "NotOK", "1", "5", "0", "NotOK", "NotOK", "NotOK"}),
                        130560);
    EXPECT_FALSE(fs::exists(aMli + "_tmp"));
}

TEST(SubapertureMultiLook, SumsSubaperturesStackedInLines)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aSlc = aEnv.workPath("sub_slc").string();
    const std::string aMli = aEnv.workPath("sub_pwr").string();
    const std::string aPar = aEnv.workPath("sub_par").string();
    writeSlc(aSlc, 8, 9);  // two subapertures of 4 lines: rows 4..7 are the second one's
    {
        auto h = CDescriptionHeader::makeFull();
        ASSERT_TRUE(h->read((aSlc + "_hdr").c_str(), true));
        (*h)["NrOfLinesPerImage"].setValue(4);
        ASSERT_TRUE(h->write((aSlc + ".sml").c_str(), true, false));
        CDescriptionHeader p({"sar_processing"});
        p["AzSubaperture"].setValue(2);
        p["AzPresumming"].setValue(1);
        p["AzDetectionLooks"].setValue(3);
        p["RgDetectionLooks"].setValue(3);
        ASSERT_TRUE(p.write((aPar + ".sml").c_str(), true, false));
    }
    ASSERT_EQ(runStep(qorv_AzSubaperture_multi_SLC, {"multi look", aSlc, aMli, aPar}), 0);
    auto h = readHeader(aMli);
    EXPECT_EQ((*h)["NAzimuthLooks"].getInteger(), 6);
    ASSERT_EQ((*h)["NrOfLinesPerImage"].getInteger(), 1);
    ASSERT_EQ((*h)["NrOfPixelsPerLine"].getInteger(), 3);
    const std::vector<float> aData = readMli(aMli, *h);
    // Centre line 1 (rows 0..2 and 4..6), centre columns 1, 4, 7: the mean over both subapertures.
    for (int x = 0; x < 3; ++x)
        EXPECT_NEAR(aData[x], (rampMean(3 * x, 3, 0, 3) + rampMean(3 * x, 3, 4, 3)) / 2.0, 1e-3) << x;

    // Input that is not complex, and looks below 1.
    aEnv.reinit();
    const std::string aReal = aEnv.workPath("real_slc").string();
    writeSlc(aReal, 4, 4, "FLOAT");
    EXPECT_QORV_FAILURE(runStep(qorv_AzSubaperture_multi_SLC, {"multi look", aReal, aMli, aPar}), 130560);
    aEnv.reinit();
    EXPECT_QORV_FAILURE(runStep(qorv_AzSubaperture_multi_SLC, {"multi look", aSlc, aMli, aPar, "0", "1"}), 130560);
    aEnv.reinit();
    EXPECT_QORV_FAILURE(runStep(qorv_AzSubaperture_multi_SLC, {"multi look", aSlc, aMli, aEnv.workPath("no_par").string()}),
                        261122);
}

TEST(MultiLookDriver, StepSixRunsOnAnSlcThroughTheDriverProgram)
{
    qtest::DriverSandbox aBox;
    const std::string aSlc = (aBox.data() / "scene_slc").string();
    {
        qtest::InProcessEnvironment aEnv;
        writeSlc(aSlc, 5, 6);
    }
    auto aArgs = qtest::DriverSandbox::defaultArguments(aSlc, aBox.data() / "x_pwr");
    aArgs[1] = "NotOK";  // no focusing: step 6 takes the input itself, after step 0
    aArgs[3] = "2";
    aArgs[4] = "2";
    aArgs[5] = "OK";
    const qtest::RunResult aRun = aBox.run(aBox.writeArguments(aArgs));
    ASSERT_EQ(aRun.mStatus, 0) << aRun.mStderr << aBox.trace();
    EXPECT_NE(aBox.trace().find("Multi look input file : " + aSlc), std::string::npos);
    qtest::InProcessEnvironment aEnv;
    const std::string aMli = (aBox.data() / "x_pwr").string();
    auto h = readHeader(aMli);
    const std::vector<float> aData = readMli(aMli, *h);
    ASSERT_EQ(aData.size(), 6u);
    EXPECT_NEAR(aData[5], rampMean(4, 2, 2, 2), 1e-4);
}
