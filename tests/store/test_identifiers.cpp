// Sensor and original product lookups: exact text, and the later of two equal rows wins.
#include <string>

#include <gtest/gtest.h>

#include "qorv_identifiers.h"
#include "qorvex_test_support.h"

TEST(StoreIdentifiers, LookupsAreExactAndTheLaterEqualRowWins)
{
    qtest::InProcessEnvironment aEnv;  // the product lookup traces its result
    EXPECT_EQ(fqorvSensorStrToID("ERS-2"), 2);
    EXPECT_EQ(fqorvSensorStrToID(" TM5"), 10);
    EXPECT_EQ(fqorvSensorStrToID("TM"), -1);
    EXPECT_EQ(fqorvSensorStrToID("ers-2"), -1);
    EXPECT_EQ(fqorvSensorStrToID("ERS-2 "), -1);
    EXPECT_EQ(fqorvSensorStrToID(nullptr), -1);
    EXPECT_EQ(fqorvOrigProdStrToID("ers_raw"), 0);
    EXPECT_EQ(fqorvOrigProdStrToID("ERS_RAW"), -1);
    EXPECT_EQ(fqorvOrigProdStrToID(""), -1);
    EXPECT_EQ(fqorvOrigProdStrToID(nullptr), -1);
    const char* aText = nullptr;
    int aId = 0, aFirst = -1, aLast = -1;
    for (int r = 0; fqorvOrigProdRow(r, aText, aId); ++r)
        if (std::string(aText) == "radarsat2_dual_ssg") (aFirst < 0 ? aFirst : aLast) = aId;
    ASSERT_NE(aLast, -1);
    EXPECT_NE(aFirst, aLast);
    EXPECT_EQ(fqorvOrigProdStrToID("radarsat2_dual_ssg"), aLast);
    EXPECT_NE(aEnv.trace().find("fqorvOrigProdStrToID(aConstStr) = "), std::string::npos);
}
