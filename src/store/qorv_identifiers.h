// Sensor and original product identifiers: the texts of a header turned into the small integers
// on which the processing code branches.
#pragma once

// Sensor ids of "Sensor.SensorName" (8 and 9 are unused).
inline constexpr int CSAR_SENSOR_UNKNOWN_ID = -1;
inline constexpr int CSAR_SENSOR_RADARSAT1_ID = 0;
inline constexpr int CSAR_SENSOR_ERS1_ID = 1;
inline constexpr int CSAR_SENSOR_ERS2_ID = 2;
inline constexpr int CSAR_SENSOR_JERS1_ID = 3;
inline constexpr int CSAR_SENSOR_ENVISAT1_ID = 4;
inline constexpr int CSAR_SENSOR_SIRC_ID = 5;
inline constexpr int CSAR_SENSOR_ALOS_PALSAR_ID = 6;
inline constexpr int CSAR_SENSOR_ORBISAR1_ID = 7;
inline constexpr int CSAR_SENSOR_TM_ID = 10;
inline constexpr int CSAR_SENSOR_IKONOS_ID = 11;
inline constexpr int CSAR_SENSOR_SPOT_ID = 12;
inline constexpr int CSAR_SENSOR_NOAA_ID = 13;
inline constexpr int CSAR_SENSOR_ATSR_ID = 14;
inline constexpr int CSAR_SENSOR_AATSR_ID = 15;
inline constexpr int CSAR_SENSOR_ETM_ID = 16;
inline constexpr int CSAR_SENSOR_ETM_PLUS_ID = 17;  // never returned: "ETM" is tested first
inline constexpr int CSAR_SENSOR_RADARSAT2_ID = 18;
inline constexpr int CSAR_SENSOR_TSX1_ID = 19;
inline constexpr int CSAR_SENSOR_CSK_ID = 20;
inline constexpr int CSAR_SENSOR_TELAER_ID = 21;
inline constexpr int CSAR_SENSOR_SARLUPE_ID = 22;
inline constexpr int CSAR_SENSOR_STANAG_ID = 23;

// Original product ids of the user key "ORIGIN DATA" (those the processing code names).
inline constexpr int CQORV_ORIG_PROD_UNKNOWN_ID = -1;
inline constexpr int CQORV_ORIG_PROD_ERS_RAW_ID = 0;
inline constexpr int CQORV_ORIG_PROD_ERS_SLC_ID = 1;
inline constexpr int CQORV_ORIG_PROD_ERS_PRI_ID = 2;
inline constexpr int CQORV_ORIG_PROD_RADARSAT_SLC_ID = 3;
inline constexpr int CQORV_ORIG_PROD_ASA_APS_1P_ID = 8;    // "ENVISAT_APS"
inline constexpr int CQORV_ORIG_PROD_ASA_IMS_1P_ID = 10;   // "ENVISAT_IMS"
inline constexpr int CQORV_ORIG_PROD_JERS_1_RAW_ID = 22;
inline constexpr int CQORV_ORIG_PROD_SIR_C_RAW_ID = 24;
inline constexpr int CQORV_ORIG_PROD_USER_RAW_ID = 25;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_PLR11_ID = 26;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_PLR10_ID = 37;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_FBS10_ID = 38;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_FBD10_ID = 39;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_KC_SCANSAR_ID = 43;   // also "ALOS_PALSAR_WBSR"
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_KC_STRIPMAP_ID = 44;  // also "ALOS_PALSAR_AMPSR"
inline constexpr int CQORV_ORIG_PROD_ENVISAT_AP0_ID = 45;
inline constexpr int CQORV_ORIG_PROD_ENVISAT_IM0_ID = 46;
inline constexpr int CQORV_ORIG_PROD_TSX1_SSC_HS_SINGLE_ID = 75;
inline constexpr int CQORV_ORIG_PROD_TSX1_SSC_HS_DUAL_ID = 76;
inline constexpr int CQORV_ORIG_PROD_TSX1_SSC_SL_SINGLE_ID = 77;
inline constexpr int CQORV_ORIG_PROD_TSX1_SSC_SL_DUAL_ID = 78;
inline constexpr int CQORV_ORIG_PROD_RADARSAT2_SLC_ID = 101;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_ERSDAC_PLR10_ID = 105;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_ERSDAC_FBS10_ID = 106;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_ERSDAC_FBD10_ID = 107;
inline constexpr int CQORV_ORIG_PROD_CSK_SCS_B_ENHANCED_SPOTLIGHT_ID = 119;
inline constexpr int CQORV_ORIG_PROD_CSK_SCS_B_SMART_ID = 120;
inline constexpr int CQORV_ORIG_PROD_CSK_SCS_U_ENHANCED_SPOTLIGHT_ID = 125;
inline constexpr int CQORV_ORIG_PROD_CSK_SCS_U_SMART_ID = 126;
inline constexpr int CQORV_ORIG_PROD_ASA_IM0_ID = 164;
inline constexpr int CQORV_ORIG_PROD_SAR_IM0_ID = 165;
inline constexpr int CQORV_ORIG_PROD_ASA_AP0_ID = 166;
inline constexpr int CQORV_ORIG_PROD_ENVISAT_ERS_SLC_ID = 167;
inline constexpr int CQORV_ORIG_PROD_ERS_ENVISAT_PRI_ID = 168;
inline constexpr int CQORV_ORIG_PROD_JERS_1_JAXA_SLC_ID = 169;
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_GRID_MGA_PLR_ID = 176;  // first of the gridded group 176-184
inline constexpr int CQORV_ORIG_PROD_ALOS_PALSAR_GRID_MGO_FBS_ID = 184;  // last of that group
inline constexpr int CQORV_ORIG_PROD_ERS_SLC_JAXA_ID = 191;

/// Number of rows of the product table.
inline constexpr int CQORV_ORIG_PROD_TABLE_ROWS = 183;

/// Sensor id of a "Sensor.SensorName" text: exact comparisons, " TM", "ETM" and "ETM+" as
/// prefixes (tested first, in that order); -1 for null, empty or unknown texts.
int fqorvSensorStrToID(const char* aName);

/// Row i of the sensor table (text and id), for listings and suggestions; false outside the table.
bool fqorvSensorRow(int theRow, const char*& theText, int& theId);

/// Product id of an "ORIGIN DATA" text: the whole table is walked and the last exact match wins;
/// -1 for null or unknown texts. The trace shows the result.
int fqorvOrigProdStrToID(const char* aConstStr);

/// Row i of the product table (text and id), for listings and checks; false outside the table.
bool fqorvOrigProdRow(int theRow, const char*& theText, int& theId);
