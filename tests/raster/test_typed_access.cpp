// Typed line access: conversions of every cell type, scale factors, null values, directions.
#include <cmath>
#include <limits>

#include <gtest/gtest.h>

#include "qorv_errors.h"
#include "qorvex_test_support.h"
#include "raster_test_util.h"
#include "tools_raster_file_exp.h"

using namespace rtest;

namespace {

class TypedAccessTest : public ::testing::Test {
protected:
    std::string path(const std::string& theName) const { return mEnv.workPath(theName).string(); }
    qtest::InProcessEnvironment mEnv;
};

constexpr int CPIXELS = 6;

}  // namespace

// Each cell type and byte order: what a typed write stores, a typed read gives back, as complex
// samples, as real values and in the power form.
TEST_F(TypedAccessTest, EveryCellTypeRoundTrip)
{
    for (int aType = 0; aType < CQORV_CELL_TYPE_NBR; ++aType) {
        for (bool aMSBF : {false, true}) {
            SCOPED_TRACE(std::string(fqorvCellTypeName(aType)) + (aMSBF ? " MSBF" : " LSBF"));
            const bool aBit = aType == CQORV_CELL_BIT, aComplex = fqorvCellTypeIsComplex(aType);
            const CRasterFileParam p = param(path("typed_" + std::to_string(aType) + (aMSBF ? "m" : "l")), 3, CPIXELS, aType, aMSBF);
            std::vector<fcomplex> aSamples(CPIXELS), aUnit(CPIXELS, fcomplex(1.0f, 1.0f)), aBack(CPIXELS);
            std::vector<float> aReals(CPIXELS), aRealBack(CPIXELS);
            std::vector<double> aPower(CPIXELS);
            for (int k = 0; k < CPIXELS; ++k) {
                aSamples[k] = fcomplex(float(k), 1.0f);
                aReals[k] = aBit ? float(k % 2) : float(3 * k);
            }
            CRasterFile f;
            f.openWrite(CQORV_RF_OPEN_WRITE, p);
            fqorvWriteLine(f, aSamples.data(), 0);     // complex buffer: both parts, or the detected value
            fqorvWriteLine(f, aReals.data(), 1);       // real buffer: the value, or (value, 0)
            fqorvWriteLine(f, aUnit.data(), 2, true);  // detected: 2
            f.close();

            f.openRead(p);
            fqorvReadLine(f, aBack.data(), 0);
            fqorvReadLine(f, aPower.data(), 0);
            for (int k = 0; k < CPIXELS; ++k) {
                const float aDetected = float(k * k + 1);
                EXPECT_EQ(aBack[k], aBit ? fcomplex(1.0f, 0.0f) : aComplex ? aSamples[k] : fcomplex(aDetected, 0.0f)) << k;
                if (!aBit) {
                    EXPECT_EQ(aPower[k], double(aDetected)) << k;
                }
            }
            fqorvReadLine(f, aRealBack.data(), 1);
            fqorvReadLine(f, aBack.data(), 1);
            for (int k = 0; k < CPIXELS; ++k) {
                EXPECT_EQ(aRealBack[k], aComplex ? aReals[k] * aReals[k] : aReals[k]) << k;
                EXPECT_EQ(aBack[k], fcomplex(aReals[k], 0.0f)) << k;
            }
            fqorvReadLine(f, aBack.data(), 2);
            EXPECT_EQ(aBack[CPIXELS - 1], fcomplex(aBit ? 1.0f : 2.0f, 0.0f));
            f.close();
        }
    }
}

// Integer cells take truncation toward zero wrapped to their width; non-finite values become the
// null value; the root and detect flags.
TEST_F(TypedAccessTest, WriteConversions)
{
    const float aNaN = std::numeric_limits<float>::quiet_NaN();
    const float aInf = std::numeric_limits<float>::infinity();
    const std::vector<float> aValues = {-3.7f, 2.9f, aNaN, aInf, 300.5f, -0.5f};

    auto aWriteRaw = [&](int theType, auto theBuffer, bool theDetect, bool theRoot, std::size_t theBytes) {
        const std::string aName = path("conv_" + std::to_string(theType));
        CRasterFile w;
        w.openWrite(CQORV_RF_OPEN_WRITE, param(aName, 1, CPIXELS, theType));
        fqorvWriteLine(w, theBuffer, 0, theDetect, theRoot);
        w.close();
        std::vector<uint8_t> aBytes = fileBytes(aName);
        EXPECT_EQ(aBytes.size(), theBytes);
        return aBytes;
    };

    std::vector<uint8_t> aShort = aWriteRaw(CQORV_CELL_SHORT, aValues.data(), false, false, CPIXELS * 2);
    EXPECT_EQ(fromBytes<int16_t>(aShort.data(), CPIXELS), (std::vector<int16_t>{-3, 2, -9999, -9999, 300, 0}));
    std::vector<uint8_t> aByte = aWriteRaw(CQORV_CELL_UNSIGNED_BYTE, aValues.data(), false, false, CPIXELS);
    EXPECT_EQ(aByte[0], 253);  // -3 wrapped
    EXPECT_EQ(aByte[4], 44);   // 300 wrapped

    const std::vector<float> aSquares = {4, 9, 0, 16, aNaN, 1};
    std::vector<uint8_t> aRoot = aWriteRaw(CQORV_CELL_FLOAT, aSquares.data(), false, true, CPIXELS * 4);
    EXPECT_EQ(fromBytes<float>(aRoot.data(), CPIXELS), (std::vector<float>{2, 3, 0, 4, -9999, 1}));

    const std::vector<fcomplex> aSamples(CPIXELS, fcomplex(3.0f, 4.0f));
    std::vector<uint8_t> aDetected = aWriteRaw(CQORV_CELL_FLOAT, aSamples.data(), false, false, CPIXELS * 4);
    EXPECT_EQ(fromBytes<float>(aDetected.data(), 1)[0], 25.0f);
    aDetected = aWriteRaw(CQORV_CELL_FLOAT, aSamples.data(), false, true, CPIXELS * 4);
    EXPECT_EQ(fromBytes<float>(aDetected.data(), 1)[0], 5.0f);
    aDetected = aWriteRaw(CQORV_CELL_FLOAT_COMPLEX, aSamples.data(), true, true, CPIXELS * 8);
    EXPECT_EQ(fromBytes<fcomplex>(aDetected.data(), 1)[0], fcomplex(5.0f, 0.0f));

    std::vector<fcomplex> aBad(CPIXELS, fcomplex(aNaN, 2.0f));
    aBad[1] = fcomplex(1.0f, -aInf);
    std::vector<uint8_t> aParts = aWriteRaw(CQORV_CELL_FLOAT_COMPLEX, aBad.data(), false, false, CPIXELS * 8);
    const std::vector<fcomplex> aStored = fromBytes<fcomplex>(aParts.data(), 2);
    EXPECT_EQ(aStored[0], fcomplex(-9999.0f, 2.0f));
    EXPECT_EQ(aStored[1], fcomplex(1.0f, -9999.0f));
}

// Scale factors apply part by part; a part equal to the null value stays the null value, and a
// NaN null value matches NaN cells.
TEST_F(TypedAccessTest, ScaleFactorsAndNullValues)
{
    const std::string aName = path("scaled");
    std::vector<fcomplex> aCells = {{1, 4}, {-9999, -9999}, {-9999, 3}, {0, 0}, {-2, 2}, {5, 0}};
    writeBytes(aName, asBytes(aCells));

    CRasterFileParam p = param(aName, 1, CPIXELS, CQORV_CELL_FLOAT_COMPLEX);
    p.mRealScaleFactor = 2.0;
    p.mImaginaryScaleFactor = 0.5;
    CRasterFile f;
    f.openRead(p);
    std::vector<fcomplex> aBack(CPIXELS);
    fqorvReadLine(f, aBack.data(), 0);
    EXPECT_EQ(aBack[0], fcomplex(2.0f, 2.0f));
    EXPECT_EQ(aBack[1], fcomplex(-9999.0f, -9999.0f));
    EXPECT_EQ(aBack[2], fcomplex(-9999.0f, 1.5f));
    EXPECT_EQ(aBack[4], fcomplex(-4.0f, 1.0f));
    std::vector<double> aPower(CPIXELS);
    fqorvReadLine(f, aPower.data(), 0);
    EXPECT_DOUBLE_EQ(aPower[0], 8.0);
    EXPECT_EQ(aPower[1], -9999.0);  // a null cell stays null in the power form
    EXPECT_DOUBLE_EQ(aPower[4], 17.0);
    f.close();

    // Without scale factors the parts are cast straight; a null cell still stays null.
    p.mRealScaleFactor = p.mImaginaryScaleFactor = 1.0;
    f.openRead(p);
    fqorvReadLine(f, aBack.data(), 0);
    fqorvReadLine(f, aPower.data(), 0);
    EXPECT_EQ(aBack[2], fcomplex(-9999.0f, 3.0f));
    EXPECT_EQ(aPower[1], -9999.0);
    f.close();

    const std::string aReal = path("scaled_real");
    const float aNaN = std::numeric_limits<float>::quiet_NaN();
    writeBytes(aReal, asBytes(std::vector<float>{2, aNaN, -1, 0, 1, 3}));
    CRasterFileParam q = param(aReal, 1, CPIXELS, CQORV_CELL_FLOAT);
    q.mDummyVal = std::nan("");
    q.mRealScaleFactor = 3.0;
    f.openRead(q);
    std::vector<float> aValues(CPIXELS);
    fqorvReadLine(f, aValues.data(), 0);
    EXPECT_EQ(aValues[0], 6.0f);
    EXPECT_TRUE(std::isnan(aValues[1]));
    EXPECT_EQ(aValues[2], -3.0f);
    f.close();
}

// Mirrored directions: row r is the file's line (lines-1-r), buffer index k the file's column
// (pixels-1-k), for reads and writes, with column ranges mirrored too.
TEST_F(TypedAccessTest, MirroredTimeDirections)
{
    const int aLines = 3, aPixels = 4;
    const std::string aName = path("mirror");
    CRasterFileParam p = param(aName, aLines, aPixels, CQORV_CELL_FLOAT);
    p.mLinesTimeDecrease = true;
    p.mPixelsTimeDecrease = true;
    CRasterFile w;
    w.openWrite(CQORV_RF_OPEN_WRITE, p);
    std::vector<float> aRow(aPixels);
    for (int r = 0; r < aLines; ++r) {
        for (int k = 0; k < aPixels; ++k) aRow[k] = float(r * 10 + k);
        fqorvWriteLine(w, aRow.data(), r);
    }
    w.close();

    const std::vector<float> aFile = fromBytes<float>(fileBytes(aName).data(), aLines * aPixels);
    for (int l = 0; l < aLines; ++l)
        for (int c = 0; c < aPixels; ++c)
            EXPECT_EQ(aFile[l * aPixels + c], float((aLines - 1 - l) * 10 + (aPixels - 1 - c))) << l << "," << c;

    CRasterFile r;
    r.openRead(p);
    std::vector<float> aTwo(2);
    fqorvReadLine(r, aTwo.data(), 1, 1, 2);
    EXPECT_EQ(aTwo, (std::vector<float>{11, 12}));
    fqorvReadLine(r, aTwo.data(), 2, 2, 3);
    EXPECT_EQ(aTwo, (std::vector<float>{22, 23}));
    r.close();

    // Pixels mirrored alone, read through a prefixed file (the per-line road).
    std::vector<uint8_t> aBytes;
    for (int l = 0; l < aLines; ++l) {
        const std::vector<uint8_t> aLine = asBytes(std::vector<float>{float(l * 100), float(l * 100 + 1), float(l * 100 + 2), float(l * 100 + 3)});
        aBytes.push_back(0x55);
        aBytes.insert(aBytes.end(), aLine.begin(), aLine.end());
    }
    p = param(path("mirror_prefixed"), aLines, aPixels, CQORV_CELL_FLOAT);
    writeBytes(p.mFileName, aBytes);
    p.mRowPrefix = 1;
    p.mPixelsTimeDecrease = true;
    r.openRead(p);
    std::vector<float> aThree(3);
    fqorvReadLine(r, aThree.data(), 2, 0, 2);
    EXPECT_EQ(aThree, (std::vector<float>{203, 202, 201}));
    r.close();
}

// Integer complex buffers read and write their cells without a float step (the 16-bit road of the
// subaperture step).
TEST_F(TypedAccessTest, IntegerComplexBuffers)
{
    const std::string aName = path("short_complex");
    const CRasterFileParam p = param(aName, 1, 3, CQORV_CELL_SHORT_COMPLEX, true);
    std::vector<scomplex> aCells = {{-32768, 32767}, {-1, 1}, {1234, -4321}};
    CRasterFile w;
    w.openWrite(CQORV_RF_OPEN_WRITE, p);
    fqorvWriteLine(w, aCells.data(), 0);
    w.close();
    CRasterFile r;
    r.openRead(p);
    std::vector<scomplex> aBack(3);
    fqorvReadLine(r, aBack.data(), 0);
    EXPECT_EQ(aBack, aCells);
    std::vector<fcomplex> aFloat(3);
    fqorvReadLine(r, aFloat.data(), 0);
    EXPECT_EQ(aFloat[0], fcomplex(-32768.0f, 32767.0f));
    r.close();
}
