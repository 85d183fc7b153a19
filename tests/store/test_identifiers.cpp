// The sensor and original product tables.
#include <map>
#include <set>

#include <gtest/gtest.h>

#include "qorv_identifiers.h"
#include "qorvex_test_support.h"

TEST(StoreIdentifiers, SensorNames)
{
    const std::map<std::string, int> aCases = {
        {"RADARSAT-1", 0}, {"RSAT-1", 0}, {"ERS-1", 1}, {"ERS-2", 2}, {"JERS-1", 3}, {"ENVISAT-1", 4},
        {"SIR-C", 5}, {"ALOS_PALSAR", 6}, {"ORBISAR-1", 7}, {" TM", 10}, {" TM5", 10}, {"TM", -1},
        {"IKONOS", 11}, {"SPOT", 12}, {"NOAA", 13}, {"ATSR", 14}, {"AATSR", 15}, {"ETM", 16},
        {"ETM+", 16}, {"ETM+7", 16}, {"RADARSAT-2", 18}, {"TSX-1", 19}, {"CSK", 20}, {"TELAER", 21},
        {"SARLUPE", 22}, {"STANAG", 23}, {"", -1}, {"ers-2", -1}, {"ERS-2 ", -1}};
    for (const auto& [aName, aId] : aCases) EXPECT_EQ(fqorvSensorStrToID(aName.c_str()), aId) << "'" << aName << "'";
    EXPECT_EQ(fqorvSensorStrToID(nullptr), -1);
    EXPECT_EQ(CSAR_SENSOR_JERS1_ID, 3);
    EXPECT_EQ(CSAR_SENSOR_CSK_ID, 20);
}

TEST(StoreIdentifiers, ProductTableShapeAndTellingRows)
{
    qtest::InProcessEnvironment aEnv;  // the function traces its result
    std::multiset<int> aIds;
    std::set<std::string> aTexts;
    const char* aText = nullptr;
    int aId = 0;
    int aRows = 0;
    while (fqorvOrigProdRow(aRows, aText, aId)) {
        aIds.insert(aId);
        aTexts.insert(aText);
        ++aRows;
    }
    ASSERT_EQ(aRows, 183);
    EXPECT_EQ(aTexts.size(), 181u);  // two texts stand twice
    for (int i = 0; i <= 191; ++i) {
        const std::size_t aExpected = (i == 48 || (i >= 148 && i <= 157)) ? 0 : (i == 43 || i == 44) ? 2 : 1;
        EXPECT_EQ(aIds.count(i), aExpected) << "id " << i;
    }
    const std::map<std::string, int> aTelling = {
        {"ers_raw", 0}, {"ers_slc", 1}, {"ers_pri", 2}, {"radarsat_slc", 3}, {"ENVISAT_IMS", 10},
        {"JERS_1_RAW", 22}, {"SIR_C_RAW", 24}, {"USER_RAW", 25}, {"ALOS_PALSAR_PLR11", 26},
        {"ALOS_PALSAR_PLR10", 37}, {"ALOS_PALSAR_FBS10", 38}, {"ALOS_PALSAR_FBD10", 39},
        {"ALOS_PALSAR_KC_SCANSAR", 43}, {"ALOS_PALSAR_WBSR", 43}, {"ALOS_PALSAR_AMPSR", 44},
        {"ALOS_PALSAR_KC_STRIPMAP", 44}, {"TSX1_SSC_HS_SINGLE", 75}, {"TSX1_SSC_SL_DUAL", 78},
        {"radarsat2_slc", 101}, {"ALOS_PALSAR_ERSDAC_PLR10", 105}, {"ALOS_PALSAR_ERSDAC_FBS10", 106},
        {"ALOS_PALSAR_ERSDAC_FBD10", 107}, {"CSK_SCS_B_ENHANCED SPOTLIGHT", 119}, {"CSK_SCS_B_SMART", 120},
        {"CSK_SCS_U_ENHANCED SPOTLIGHT", 125}, {"CSK_SCS_U_SMART", 126}, {"SAR__IM0", 165}, {"ASA__AP0", 166},
        {"ENVISAT_ers_slc", 167}, {"ERS_ENVISAT_PRI", 168}, {"JERS_1_JAXA_SLC", 169},
        {"ALOS_PALSAR_GRID_MGA_PLR", 176}, {"ALOS_PALSAR_GRID_MGO_FBS", 184}, {"ERS_SLC_JAXA", 191}};
    for (const auto& [aName, aExpected] : aTelling) EXPECT_EQ(fqorvOrigProdStrToID(aName.c_str()), aExpected) << aName;
    EXPECT_EQ(fqorvOrigProdStrToID(nullptr), -1);
    EXPECT_EQ(fqorvOrigProdStrToID(""), -1);
    EXPECT_EQ(fqorvOrigProdStrToID("ERS_RAW"), -1);  // exact case
    EXPECT_EQ(fqorvOrigProdStrToID("ENVISAT_IMS"), CQORV_ORIG_PROD_ASA_IMS_1P_ID);
    EXPECT_EQ(fqorvOrigProdStrToID("ENVISAT_APS"), CQORV_ORIG_PROD_ASA_APS_1P_ID);
    // With two equal texts the later row wins.
    int aFirst = -1, aLast = -1;
    for (int r = 0; fqorvOrigProdRow(r, aText, aId); ++r)
        if (std::string(aText) == "radarsat2_dual_ssg") (aFirst < 0 ? aFirst : aLast) = aId;
    ASSERT_NE(aLast, -1);
    EXPECT_NE(aFirst, aLast);
    EXPECT_EQ(fqorvOrigProdStrToID("radarsat2_dual_ssg"), aLast);
    EXPECT_NE(aEnv.trace().find("fqorvOrigProdStrToID(aConstStr) = 191"), std::string::npos);
}
