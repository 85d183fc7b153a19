// The image description read from simulated headers: the Doppler centroid that the azimuth steps
// evaluate, from an imported one-row polynomial (per-sensor rules) and from the estimator's
// table (day, seconds, coefficients in metres), and the failures of a header it cannot describe.
#include <cmath>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "geometry_test_util.h"
#include "qorv_date.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_read_write_info.h"
#include "qorvex_test_support.h"

namespace {

constexpr double kC = 299792458.0;

class ImageInfo : public ::testing::Test {
protected:
    qtest::InProcessEnvironment mEnv;
};

/// Writes a table as the estimator does: rows every theRowStep lines, day and seconds of that
/// line, then c0 + c1 R with R the slant range in metres.
void writeEstimatorTable(CDescriptionHeader& h, int theRows, int theRowStep, double theC0, double theRowSlope, double theC1)
{
    const CQorvDate aStart = fqorvParseDateField(h["AcquisitionParameters.AzimuthStartTime"].getString(), "start");
    const double aPrf = h["ChannelInfo.PRF"].getDouble(0);
    CDescriptionField& f = h["Processing.DopCenRangeCoeff"];
    f.resize(theRows, 4);
    for (int i = 0; i < theRows; ++i) {
        double aSeconds = i * theRowStep / aPrf + aStart.secondsOfDay();
        double aDay = static_cast<double>(aStart.dayNumber());
        if (aSeconds > 86400.0) {
            aSeconds -= 86400.0;
            aDay += 1.0;
        }
        f.setValue(i, 0, aDay);
        f.setValue(i, 1, aSeconds);
        f.setValue(i, 2, theC0 + theRowSlope * i);
        f.setValue(i, 3, theC1);
    }
    h["Processing.DopplerEstimatedFlag"].setValue("OK");
}

TEST_F(ImageInfo, ImportedPolynomialFollowsTheSensorsRule)
{
    const double c[5] = {250.0, -3.0e5, 2.0e9, 0.0, 0.0};
    for (const char* aPreset : {"ers2", "envisat", "alos"}) {
        CSimProductHeader p(aPreset, 1200, 1024);
        CDescriptionHeader& h = *p.mHeader;
        h["Processing.DopCenRangeCoeff"].resize(1, 5);
        for (int i = 0; i < 5; ++i) h["Processing.DopCenRangeCoeff"].setValue(0, i, c[i]);
        YDF_SAR s;
        ASSERT_EQ(read_image_info(h, s), 0);
        EXPECT_FALSE(s.mDopplerTableFlag);
        EXPECT_TRUE(s.mUseDopplerFlag);
        EXPECT_NEAR(s.lam, kC / h["ChannelInfo.CarrierFrequency"].getDouble(0), 1e-12);
        for (double aPixel : {0.0, 300.5, 1023.0}) {
            const double r = h["Processing.SlantRange"].getDouble(0) + aPixel * h["Processing.PixelSpacingRg"].getDouble();
            const double tau = 2.0 * (r - h["Processing.SlantRange"].getDouble(0)) / kC;
            double e = c[0];  // ERS-2 raw: the constant term alone
            if (s.getSensorId() == 4) e = c[0] + c[1] * tau + c[2] * tau * tau;                // ENVISAT: in two-way time
            if (s.getSensorId() == 6) e = c[0] + c[1] * aPixel + c[2] * aPixel * aPixel;      // ALOS: in pixels
            EXPECT_NEAR(s.getDopplerFromPixel(aPixel, 600.0, true, true), e, 1e-6 * std::fabs(e) + 1e-9) << aPreset << " " << aPixel;
            EXPECT_NEAR(s.getDopplerFromSlantRangeDist(r, 0.0, false, false), e, 1e-6 * std::fabs(e) + 1e-9);
        }
    }
    // The setting that switches Doppler use off.
    CSimProductHeader p("ers2", 1200, 1024);
    (*p.mHeader)["Processing.DopCenRangeCoeff"].resize(1, 1);
    (*p.mHeader)["Processing.DopCenRangeCoeff"].setValue(0, 0, 250.0);
    fdfSetEnvVar("YES", "QORVEX_DISABLE_DOPPLER");
    YDF_SAR s;
    read_image_info(*p.mHeader, s);
    EXPECT_FALSE(s.mUseDopplerFlag);
    EXPECT_EQ(s.getDopplerFromPixel(10.0, 10.0, true, true), 0.0);
    fdfSetEnvVar("NO", "QORVEX_DISABLE_DOPPLER");
}

TEST_F(ImageInfo, EstimatorTableIsBlendedByLineTimeForEverySensor)
{
    for (const char* aPreset : {"ers2", "envisat", "alos"}) {
        CSimProductHeader p(aPreset, 1200, 1024);
        CDescriptionHeader& h = *p.mHeader;
        // Rows every 100 lines: c0 rises 10 Hz per row, 2 mHz per metre of slant range.
        writeEstimatorTable(h, 12, 100, -500.0, 10.0, 2.0e-3);
        YDF_SAR s;
        read_image_info(h, s);
        ASSERT_TRUE(s.mDopplerTableFlag) << aPreset;
        EXPECT_NEAR(s.mDopplerTableTimeSpan, 100.0 / s.prf, 1e-6);
        EXPECT_NEAR(s.mDopplerTableImageOffset, 0.0, 1e-6);
        const double r = s.slantRangeOfPixel(512.0);
        for (double aLine : {0.0, 250.0, 733.0, 1100.0, 1199.0}) {
            const double aRow = std::min(aLine / 100.0, 11.0);
            // The azimuth steps pass both flags false: the estimator's table holds all the same.
            EXPECT_NEAR(s.getDopplerFromPixel(512.0, aLine, false, false), -500.0 + 10.0 * aRow + 2.0e-3 * r, 1e-4)
                << aPreset << " line " << aLine;
        }
        // The user's constant term replaces that of every row.
        h["Processing.UserDopCenRangeCoeff"].resize(1, 1);
        h["Processing.UserDopCenRangeCoeff"].setValue(0, 0, 40.0);
        read_image_info(h, s);
        EXPECT_NEAR(s.getDopplerFromSlantRangeDist(r, 733.0, true, false), 40.0 + 2.0e-3 * r, 1e-6);
    }
}

TEST_F(ImageInfo, HeaderOnDiskAndRefusedHeaders)
{
    CSimProductHeader p("ers2", 1200, 1024);
    CDescriptionHeader& h = *p.mHeader;
    const std::string aRoot = mEnv.workPath("scene").string();
    ASSERT_TRUE(h.write(aRoot.c_str(), true, false));
    YDF_SAR s;
    read_image_info(aRoot.c_str(), s);
    EXPECT_EQ(s.ncol, 1024);
    EXPECT_EQ(s.nrow, h["RasterInfo.NrOfLinesPerImage"].getInteger());
    EXPECT_NEAR(s.mSlantDistToImagePosition[0] + s.mSlantDistToImagePosition[1] * s.slantRangeOfPixel(77.0), 77.0, 1e-6);
    EXPECT_QORV_FAILURE(read_image_info(mEnv.workPath("nothing").string().c_str(), s), 261122);
    mEnv.reinit();
    h["Processing.RangeDoppler_fref"].resize(1, 10);
    EXPECT_QORV_FAILURE(read_image_info(h, s), 261121);
    mEnv.reinit();
    h["Processing.RangeDoppler_fref"].reset();
    h["InitialGeometry.Projection"].setValue("GROUND_RANGE");
    EXPECT_QORV_FAILURE(read_image_info(h, s), 261121);
}

}  // namespace
