// Cell type names, sizes and the unknown-code failure.
#include <gtest/gtest.h>

#include "qorv_cell_types.h"
#include "qorvex_test_support.h"

TEST(CellTypes, NamesCodesAndSizes)
{
    const int aBytes[CQORV_CELL_TYPE_NBR] = {1, 2, 1, 2, 2, 2, 4, 4, 8, 8, 16, 4, 4, 1, 4};
    for (int i = 0; i < CQORV_CELL_TYPE_NBR; ++i) {
        EXPECT_EQ(fqorvCellTypeFromName(fqorvCellTypeName(i)), i);
        int b = 0, n = 0;
        EXPECT_EQ(fqorvCellTypeSize(i, b, n), 0);
        EXPECT_EQ(b, aBytes[i]) << fqorvCellTypeName(i);
        EXPECT_EQ(n, fqorvCellTypeIsComplex(i) ? 2 : 1);
    }
    EXPECT_STREQ(fqorvCellTypeName(15), "WRONG CELL TYPE");
    EXPECT_STREQ(fqorvCellTypeName(-1), "WRONG CELL TYPE");
    EXPECT_EQ(fqorvCellTypeFromName("float_complex"), -1);  // exact text only
    EXPECT_EQ(fqorvCellTypeFromName(nullptr), -1);
}

TEST(CellTypes, UnknownCodeReportsOnTheTrace)
{
    qtest::InProcessEnvironment aEnv;
    int b = 0, n = 0;
    EXPECT_EQ(fqorvCellTypeSize(99, b, n), -1);
    EXPECT_EQ(b, -1);
    EXPECT_NE(aEnv.trace().find("Error: unsupported raster file type 99"), std::string::npos);
}
