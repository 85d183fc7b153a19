// Normalisation, dummy cutting and the stretch kernels against values worked out by hand.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>

#include "export_test_util.h"
#include "qorv_image_stats.h"
#include "qorv_raster_utility.h"
#include "qorvex_test_support.h"

namespace {

double userKey(const CDescriptionHeader& h, const char* theKey)
{
    std::string v;
    EXPECT_TRUE(fqorvGetUserKey(h, theKey, v)) << theKey;
    return std::atof(v.c_str());
}

/// Mean power of the non-null cells.
double meanPower(const std::vector<fcomplex>& theCells)
{
    double s = 0;
    int n = 0;
    for (const fcomplex& z : theCells)
        if (z.real() != -9999.0f) s += std::norm(z), ++n;
    return s / n;
}

TEST(Normalisation, ReachesTheTargetPowerKeepsNullsAndIsStableOnASecondRun)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aName = aEnv.workPath("scene_slc");
    // Constant amplitude 3 with varying phase, and a null border column.
    etest::writeRaster(aName, 30, 24, "FLOAT_COMPLEX", "SLC", [](int r, int c) {
        if (c == 0) return fcomplex(-9999.0f, -9999.0f);
        return std::polar(3.0f, 0.1f * static_cast<float>(r + c));
    });
    fqorvNormalizeRaster(aName.c_str(), aName.c_str(), 16000.0, 0.0, false, nullptr, 0.3333);
    std::unique_ptr<CDescriptionHeader> h;
    const auto aCells = etest::readRaster(aName, &h);
    EXPECT_NEAR(meanPower(aCells), 16000.0, 0.1);
    EXPECT_EQ(aCells[0], fcomplex(-9999.0f, -9999.0f));
    EXPECT_NEAR(userKey(*h, "NORMALIZATION FACTOR"), std::sqrt(16000.0) / 3.0, 1e-5);
    EXPECT_NEAR(userKey(*h, "NORMALIZATION MEAN"), 3.0, 1e-5);

    // A second run measures the new mean: the factor is near 1 and the pixels hardly move.
    double aFactor = 0;
    fqorvNormalizeRaster(aName.c_str(), aName.c_str(), 16000.0, 0.0, true, &aFactor, 0.3333);
    EXPECT_NEAR(aFactor, 1.0, 1e-5);
    EXPECT_NEAR(meanPower(etest::readRaster(aName)), 16000.0, 0.1);

    // With theNbrOfStd the spread of the amplitudes lowers the factor: amplitudes 1 and 3 alternate.
    const std::string aTwo = aEnv.workPath("two_slc");
    etest::writeRaster(aTwo, 12, 12, "FLOAT_COMPLEX", "SLC",
                       [](int r, int c) { return fcomplex((c / 2) % 2 ? 3.0f : 1.0f, 0.0f); });
    fqorvNormalizeRaster(aTwo.c_str(), aTwo.c_str(), 100.0, 1.0, true, &aFactor, 0.3333);
    EXPECT_NEAR(aFactor, 10.0 / (2.0 + 1.0), 1e-9);  // sample columns 4, 6: amplitudes 1 and 3
}

TEST(Normalisation, BigEndianRecordsKeepTheirPrefixesAndCellsThatAreNotFiniteBecomeNull)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aName = aEnv.workPath("big_slc");
    // Amplitude 3 in the central sample window; in row 0 a null, a NaN, an infinite and an
    // overflowing cell, set in the file's bytes (a typed write would store NaN as null).
    const auto aCell = [](int r, int c) { return std::polar(3.0f, 0.1f * static_cast<float>(r * 12 + c)); };
    etest::writeRaster(aName, 12, 12, "FLOAT_COMPLEX", "SLC", aCell, "MSBF", 4);
    const float aRow0[] = {-9999.0f, -9999.0f, std::nanf(""), 1.0f, INFINITY, 2.0f, 3e38f, 1.0f};
    {
        std::FILE* f = std::fopen(aName.c_str(), "r+b");
        for (int r = 0; r < 12; ++r) std::fseek(f, r * 100L, SEEK_SET), std::fwrite("PRFX", 1, 4, f);
        for (int k = 0; k < 8; ++k) {
            uint32_t w;
            std::memcpy(&w, &aRow0[k], 4);
            w = __builtin_bswap32(w);
            std::fseek(f, 4 + 4L * k, SEEK_SET);
            std::fwrite(&w, 4, 1, f);
        }
        std::fclose(f);
    }
    double aFactor = 0;
    fqorvNormalizeRaster(aName.c_str(), aName.c_str(), 16000.0, 0.0, true, &aFactor, 0.3333);
    ASSERT_NEAR(aFactor, std::sqrt(16000.0) / 3.0, 1e-5);
    const auto aCells = etest::readRaster(aName);
    const auto s = [&](float v) { return static_cast<float>(v * aFactor); };
    EXPECT_EQ(aCells[0], fcomplex(-9999.0f, -9999.0f));
    EXPECT_EQ(aCells[1], fcomplex(-9999.0f, 1.0f));      // a NaN part makes the cell null: not scaled
    EXPECT_EQ(aCells[2], fcomplex(-9999.0f, s(2.0f)));   // scaled, the infinite part stored as null
    EXPECT_EQ(aCells[3], fcomplex(-9999.0f, s(1.0f)));   // the product overflows single precision
    for (int k = 4; k < 144; ++k) ASSERT_EQ(aCells[k], fcomplex(s(aCell(k / 12, k % 12).real()), s(aCell(k / 12, k % 12).imag()))) << k;
    const std::string aBytes = qtest::readFile(aName);
    for (int r = 0; r < 12; ++r) EXPECT_EQ(aBytes.substr(r * 100, 4), "PRFX") << r;
}

TEST(Normalisation, AllNullRasterIsUnchangedAndMissingHeaderFails)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aName = aEnv.workPath("null_slc");
    etest::writeRaster(aName, 8, 8, "FLOAT_COMPLEX", "SLC", [](int, int) { return fcomplex(-9999.0f, -9999.0f); });
    fqorvNormalizeRaster(aName.c_str(), aName.c_str(), 16000.0, 0.0, false, nullptr, 0.3333);
    std::unique_ptr<CDescriptionHeader> h;
    for (const fcomplex& z : etest::readRaster(aName, &h)) ASSERT_EQ(z, fcomplex(-9999.0f, -9999.0f));
    EXPECT_NEAR(userKey(*h, "NORMALIZATION FACTOR"), std::sqrt(16000.0), 1e-5);

    const std::string aMissing = aEnv.workPath("absent_slc");
    EXPECT_QORV_FAILURE(fqorvNormalizeRaster(aMissing.c_str(), aMissing.c_str(), 16000.0, 0.0, false, nullptr, 0.3333),
                        261122);
}

TEST(DummyCutting, CopiesTheDataRectangleWithItsMarginAndThreshold)
{
    qtest::InProcessEnvironment aEnv;
    const std::string aIn = aEnv.workPath("in_pwr"), aOut = aEnv.workPath("out_pwr");
    // Data in rows 3..6, columns 5..9; small values (0.5) in column 2 below a threshold.
    etest::writeRaster(aIn, 12, 14, "FLOAT", "POWER", [](int r, int c) {
        if (r >= 3 && r <= 6 && c >= 5 && c <= 9) return fcomplex(static_cast<float>(100 * r + c), 0);
        if (c == 2 && r == 8) return fcomplex(0.5f, 0);
        return fcomplex(-9999.0f, 0);
    });
    ASSERT_EQ(fqorvCutDummyValues(aIn.c_str(), aOut.c_str(), 0, 1.0), 1);
    std::unique_ptr<CDescriptionHeader> h;
    auto aCells = etest::readRaster(aOut, &h);
    ASSERT_EQ((*h)["RasterInfo.NrOfLinesPerImage"].getInteger(), 4);
    ASSERT_EQ((*h)["RasterInfo.NrOfPixelsPerLine"].getInteger(), 5);
    EXPECT_EQ(aCells.front().real(), 305.0f);
    EXPECT_EQ(aCells.back().real(), 609.0f);

    // Without the threshold the small value counts; a margin of 1 widens the rectangle.
    ASSERT_EQ(fqorvCutDummyValues(aIn.c_str(), aOut.c_str(), 1, -999999.0), 1);
    aCells = etest::readRaster(aOut, &h);
    EXPECT_EQ((*h)["RasterInfo.NrOfLinesPerImage"].getInteger(), 8);   // rows 2..9
    EXPECT_EQ((*h)["RasterInfo.NrOfPixelsPerLine"].getInteger(), 10);  // columns 1..10
}

TEST(Stretch, DefaultRuleByDataUnitAgainstHandValues)
{
    // Amplitude unit, mean 2: scale = 254 x (1/3) / 2; a window mean of 2 maps to int(84.67) + 1 = 85.
    CImageStats s;
    for (double v : {1.0, 3.0}) s.add(v, false);
    ASSERT_TRUE(s.finish());
    EXPECT_DOUBLE_EQ(s.mMean, 2.0);
    EXPECT_DOUBLE_EQ(s.mStd, 1.0);
    CStretch a = fqorvMakeStretch(1, s, 0.0, -1.0, -1.0);  // saturation 0 is 1/3, scale_in and exponent defaults
    EXPECT_DOUBLE_EQ(a.mScale, 254.0 / 3.0 / 2.0);
    EXPECT_EQ(fqorvStretchByte(a, 4.0, 2), 85);
    EXPECT_EQ(fqorvStretchByte(a, 0.0, 1), 1);    // a non-null zero is 1, never 0
    EXPECT_EQ(fqorvStretchByte(a, 0.0, 0), 0);    // no non-null value
    EXPECT_EQ(fqorvStretchByte(a, 100.0, 1), 255);

    // Power unit: the statistics take sqrt(v); powers 4 and 16 give mean amplitude 3, and a power
    // of 9 maps through its root: int(sqrt(9) x 254/3/3) + 1 = 85.
    CImageStats p;
    for (double v : {4.0, 16.0}) p.add(v, true);
    ASSERT_TRUE(p.finish());
    CStretch w = fqorvMakeStretch(0, p, 1.0 / 3.0, 1.0, 1.0);
    EXPECT_DOUBLE_EQ(w.mExponent, 0.5);
    EXPECT_EQ(fqorvStretchByte(w, 9.0, 1), 85);

    // Negative values: signed mapping, zero at 128, scale 254 x 0.5 x sat / |mean|.
    CImageStats n;
    for (double v : {-2.0, 2.0}) n.add(v, false);
    ASSERT_TRUE(n.finish());
    CStretch sg = fqorvMakeStretch(5, n, 1.0, 1.0, 1.0);
    EXPECT_TRUE(sg.mSigned);
    EXPECT_EQ(fqorvStretchByte(sg, 0.0, 1), 128);
    EXPECT_EQ(fqorvStretchByte(sg, 2.0, 1), 255);   // t = 127
    EXPECT_EQ(fqorvStretchByte(sg, -9.0, 1), 1);

    // Coherence has a fixed scale of 254: 0.5 gives int(127) + 1.
    EXPECT_EQ(fqorvStretchByte(fqorvMakeStretch(3, s, 1.0, 1.0, 1.0), 0.5, 1), 128);

    // The guarded sum keeps large power totals exact to rounding.
    CGuardedSum g;
    for (int k = 0; k < 1000; ++k) g.add(1.0e13);
    EXPECT_NEAR(g.value() / 1.0e16, 1.0, 1e-12);
    EXPECT_LT(g.mSum, 2.0e14);
}

}  // namespace
