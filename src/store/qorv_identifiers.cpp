// The sensor and original product tables.
#include "qorv_identifiers.h"

#include <cstring>
#include <iterator>

#include "qorv_enviroment.h"

namespace {

struct CSensorRow {
    const char* mText;
    int mId;
    bool mPrefix;  // compared as a prefix of the name
};

// Table order, except that the prefix rows " TM", "ETM" and "ETM+" stand before "IKONOS": so a
// name beginning with "ETM+" resolves to "ETM".
constexpr CSensorRow CSENSOR_TABLE[] = {
    {"RADARSAT-1", CSAR_SENSOR_RADARSAT1_ID, false},
    {"RSAT-1", CSAR_SENSOR_RADARSAT1_ID, false},
    {"ERS-1", CSAR_SENSOR_ERS1_ID, false},
    {"ERS-2", CSAR_SENSOR_ERS2_ID, false},
    {"JERS-1", CSAR_SENSOR_JERS1_ID, false},
    {"ENVISAT-1", CSAR_SENSOR_ENVISAT1_ID, false},
    {"SIR-C", CSAR_SENSOR_SIRC_ID, false},
    {"ALOS_PALSAR", CSAR_SENSOR_ALOS_PALSAR_ID, false},
    {"ORBISAR-1", CSAR_SENSOR_ORBISAR1_ID, false},
    {" TM", CSAR_SENSOR_TM_ID, true},
    {"ETM", CSAR_SENSOR_ETM_ID, true},
    {"ETM+", CSAR_SENSOR_ETM_PLUS_ID, true},
    {"IKONOS", CSAR_SENSOR_IKONOS_ID, false},
    {"SPOT", CSAR_SENSOR_SPOT_ID, false},
    {"NOAA", CSAR_SENSOR_NOAA_ID, false},
    {"ATSR", CSAR_SENSOR_ATSR_ID, false},
    {"AATSR", CSAR_SENSOR_AATSR_ID, false},
    {"RADARSAT-2", CSAR_SENSOR_RADARSAT2_ID, false},
    {"TSX-1", CSAR_SENSOR_TSX1_ID, false},
    {"CSK", CSAR_SENSOR_CSK_ID, false},
    {"TELAER", CSAR_SENSOR_TELAER_ID, false},
    {"SARLUPE", CSAR_SENSOR_SARLUPE_ID, false},
    {"STANAG", CSAR_SENSOR_STANAG_ID, false},
};

struct CProductRow {
    const char* mText;
    int mId;
};

// The product list grew over time: a row's id is its place in that history, so the text order
// (grouped by family) and the id order differ. Ids 48 and 148 to 157 have no text; 43 and 44
// have two texts each; two texts stand twice, and the later row wins.
constexpr CProductRow CPRODUCT_TABLE[CQORV_ORIG_PROD_TABLE_ROWS] = {
    {"ers_raw", 0},
    {"ENVISAT_ers_slc", 167},
    {"ERS_ENVISAT_PRI", 168},
    {"ers_slc", 1},
    {"ers_pri", 2},
    {"radarsat_slc", 3},
    {"radarsat_sgf", 4},
    {"radarsat_scn", 5},
    {"landsat_tm", 6},
    {"landsat_etm", 7},
    {"ENVISAT_APS", 8},
    {"ENVISAT_APP", 9},
    {"ENVISAT_IMS", 10},
    {"ENVISAT_IMP", 11},
    {"ENVISAT_WSM", 12},
    {"ENVISAT_IMM", 13},
    {"ENVISAT_APM", 14},
    {"ENVISAT_GM1", 15},
    {"ENVISAT_WS_SR", 16},
    {"ENVISAT_WS_GR", 17},
    {"ENVISAT_MER_RR__1P", 18},
    {"ENVISAT_MER_RR__2P", 19},
    {"ENVISAT_MER_FR__1P", 20},
    {"ENVISAT_MER_FR__2P", 21},
    {"JERS_1_RAW", 22},
    {"JERS_1_SLC", 23},
    {"JERS_1_JAXA_SLC", 169},
    {"SIR_C_RAW", 24},
    {"USER_RAW", 25},
    {"ALOS_PALSAR_PLR11", 26},
    {"ALOS_PALSAR_FBS11", 27},
    {"ALOS_PALSAR_FBD11", 28},
    {"ALOS_PALSAR_PLR15G", 29},
    {"ALOS_PALSAR_FBS15G", 30},
    {"ALOS_PALSAR_FBD15G", 31},
    {"ALOS_PALSAR_WB115G", 32},
    {"ALOS_PALSAR_PLR15R", 33},
    {"ALOS_PALSAR_FBS15R", 34},
    {"ALOS_PALSAR_FBD15R", 35},
    {"ALOS_PALSAR_WB115R", 36},
    {"ALOS_PALSAR_PLR10", 37},
    {"ALOS_PALSAR_FBS10", 38},
    {"ALOS_PALSAR_FBD10", 39},
    {"ALOS_PALSAR_WB110", 40},
    {"ALOS_PALSAR_PSG41", 41},
    {"ALOS_PALSAR_SGP41", 42},
    {"ENVISAT_AP0", 45},
    {"ENVISAT_IM0", 46},
    {"ALOS_PALSAR_KC_SCANSAR", 43},
    {"ALOS_PALSAR_WBSR", 43},
    {"ALOS_PALSAR_AMPSR", 44},
    {"ALOS_PALSAR_KC_STRIPMAP", 44},
    {"radarsat2_slc", 101},
    {"radarsat2_sgf", 102},
    {"radarsat2_sgc", 103},
    {"radarsat2_sgx", 104},
    {"radarsat2_sing_slc", 56},
    {"radarsat2_dual_slc", 57},
    {"radarsat2_quad_slc", 58},
    {"radarsat2_sing_sgf", 59},
    {"radarsat2_dual_sgf", 60},
    {"radarsat2_quad_sgf", 61},
    {"radarsat2_sing_sgc", 62},
    {"radarsat2_dual_sgc", 63},
    {"radarsat2_quad_sgc", 64},
    {"radarsat2_sing_sgx", 65},
    {"radarsat2_dual_sgx", 66},
    {"radarsat2_quad_sgx", 67},
    {"radarsat2_scn", 68},
    {"radarsat2_scn_slc", 69},
    {"radarsat2_scw", 70},
    {"radarsat2_ssg", 71},
    {"radarsat2_spg", 72},
    {"ENVISAT_WSS", 47},
    {"radarsat_sgc", 49},
    {"radarsat_scw", 50},
    {"radarsat_scn16", 51},
    {"radarsat_scw16", 52},
    {"ALOS_PALSAR_ERSDAC_PLR11", 53},
    {"ALOS_PALSAR_ERSDAC_FBS11", 54},
    {"ALOS_PALSAR_ERSDAC_FBD11", 55},
    {"TSX1_SSC_SM_SINGLE", 73},
    {"TSX1_SSC_SM_DUAL", 74},
    {"TSX1_SSC_SM_QUAD", 185},
    {"TSX1_SSC_HS_SINGLE", 75},
    {"TSX1_SSC_HS_DUAL", 76},
    {"TSX1_SSC_HS_QUAD", 186},
    {"TSX1_SSC_SL_SINGLE", 77},
    {"TSX1_SSC_SL_DUAL", 78},
    {"TSX1_SSC_SL_QUAD", 187},
    {"TSX1_SSC_SC", 79},
    {"TSX1_MGD_SM_SINGLE", 80},
    {"TSX1_MGD_SM_DUAL", 81},
    {"TSX1_MGD_SM_QUAD", 188},
    {"TSX1_MGD_HS_SINGLE", 82},
    {"TSX1_MGD_HS_DUAL", 83},
    {"TSX1_MGD_HS_QUAD", 189},
    {"TSX1_MGD_SL_SINGLE", 84},
    {"TSX1_MGD_SL_DUAL", 85},
    {"TSX1_MGD_SL_QUAD", 190},
    {"TSX1_MGD_SC", 86},
    {"TSX1_GEC_SM_SINGLE", 87},
    {"TSX1_GEC_SM_DUAL", 88},
    {"TSX1_GEC_HS_SINGLE", 89},
    {"TSX1_GEC_HS_DUAL", 90},
    {"TSX1_GEC_SL_SINGLE", 91},
    {"TSX1_GEC_SL_DUAL", 92},
    {"TSX1_GEC_SC", 93},
    {"TSX1_EEC_SM_SINGLE", 94},
    {"TSX1_EEC_SM_DUAL", 95},
    {"TSX1_EEC_HS_SINGLE", 96},
    {"TSX1_EEC_HS_DUAL", 97},
    {"TSX1_EEC_SL_SINGLE", 98},
    {"TSX1_EEC_SL_DUAL", 99},
    {"TSX1_EEC_SC", 100},
    {"ALOS_PALSAR_ERSDAC_PLR10", 105},
    {"ALOS_PALSAR_ERSDAC_FBS10", 106},
    {"ALOS_PALSAR_ERSDAC_FBD10", 107},
    {"ALOS_PALSAR_ERSDAC_WB110", 108},
    {"radarsat2_sing_scn", 109},
    {"radarsat2_dual_scn", 110},
    {"radarsat2_sing_scw", 111},
    {"radarsat2_dual_scw", 112},
    {"radarsat2_sing_ssg", 113},
    {"radarsat2_dual_ssg", 114},
    {"radarsat2_dual_ssg", 115},
    {"radarsat2_sing_spg", 116},
    {"radarsat2_dual_spg", 117},
    {"radarsat2_dual_spg", 118},
    {"CSK_SCS_B_ENHANCED SPOTLIGHT", 119},
    {"CSK_SCS_B_SMART", 120},
    {"CSK_SCS_B_WIDEREGION", 121},
    {"CSK_SCS_B_HUGEREGION", 122},
    {"CSK_SCS_B_HIMAGE", 123},
    {"CSK_SCS_B_PINGPONG", 124},
    {"CSK_SCS_U_ENHANCED SPOTLIGHT", 125},
    {"CSK_SCS_U_SMART", 126},
    {"CSK_SCS_U_WIDEREGION", 127},
    {"CSK_SCS_U_HUGEREGION", 128},
    {"CSK_SCS_U_HIMAGE", 129},
    {"CSK_SCS_U_PINGPONG", 130},
    {"CSK_MGD_B_ENHANCED SPOTLIGHT", 131},
    {"CSK_MGD_B_SMART", 132},
    {"CSK_MGD_B_WIDEREGION", 133},
    {"CSK_MGD_B_HUGEREGION", 134},
    {"CSK_MGD_B_HIMAGE", 135},
    {"CSK_MGD_B_PINGPONG", 136},
    {"CSK_GEC_B_ENHANCED SPOTLIGHT", 137},
    {"CSK_GEC_B_SMART", 138},
    {"CSK_GEC_B_WIDEREGION", 139},
    {"CSK_GEC_B_HUGEREGION", 140},
    {"CSK_GEC_B_HIMAGE", 141},
    {"CSK_GEC_B_PINGPONG", 142},
    {"CSK_GTC_B_ENHANCED SPOTLIGHT", 143},
    {"CSK_GTC_B_SMART", 144},
    {"CSK_GTC_B_WIDEREGION", 145},
    {"CSK_GTC_B_HUGEREGION", 146},
    {"CSK_GTC_B_HIMAGE", 147},
    {"CSK_GTC_B_PINGPONG", 158},
    {"ALOS_PALSAR_ERSDAC_SSG15", 159},
    {"ALOS_PALSAR_ERSDAC_SGF15R", 160},
    {"ALOS_PALSAR_ERSDAC_SCN42R", 161},
    {"ALOS_PALSAR_ERSDAC_SGF15G", 162},
    {"ALOS_PALSAR_ERSDAC_SCN42G", 163},
    {"ASA__IM0", 164},
    {"SAR__IM0", 165},
    {"ASA__AP0", 166},
    {"ALOS_PALSAR_GRID_SCC_PLR", 170},
    {"ALOS_PALSAR_GRID_SCC_FBD", 171},
    {"ALOS_PALSAR_GRID_SCC_FBS", 172},
    {"ALOS_PALSAR_GRID_MSA_PLR", 173},
    {"ALOS_PALSAR_GRID_MSA_FBD", 174},
    {"ALOS_PALSAR_GRID_MSA_FBS", 175},
    {"ALOS_PALSAR_GRID_MGA_PLR", 176},
    {"ALOS_PALSAR_GRID_MGA_FBD", 177},
    {"ALOS_PALSAR_GRID_MGA_FBS", 178},
    {"ALOS_PALSAR_GRID_MGG_PLR", 179},
    {"ALOS_PALSAR_GRID_MGG_FBD", 180},
    {"ALOS_PALSAR_GRID_MGG_FBS", 181},
    {"ALOS_PALSAR_GRID_MGO_PLR", 182},
    {"ALOS_PALSAR_GRID_MGO_FBD", 183},
    {"ALOS_PALSAR_GRID_MGO_FBS", 184},
    {"ERS_SLC_JAXA", 191},
};

}  // namespace

int fqorvSensorStrToID(const char* aName)
{
    if (!aName || !*aName) return CSAR_SENSOR_UNKNOWN_ID;
    for (const CSensorRow& aRow : CSENSOR_TABLE) {
        const bool aHit = aRow.mPrefix ? std::strncmp(aName, aRow.mText, std::strlen(aRow.mText)) == 0
                                       : std::strcmp(aName, aRow.mText) == 0;
        if (aHit) return aRow.mId;
    }
    return CSAR_SENSOR_UNKNOWN_ID;
}

bool fqorvSensorRow(int theRow, const char*& theText, int& theId)
{
    if (theRow < 0 || theRow >= static_cast<int>(std::size(CSENSOR_TABLE))) return false;
    theText = CSENSOR_TABLE[theRow].mText;
    theId = CSENSOR_TABLE[theRow].mId;
    return true;
}

int fqorvOrigProdStrToID(const char* aConstStr)
{
    int aId = CQORV_ORIG_PROD_UNKNOWN_ID;
    if (aConstStr)
        for (const CProductRow& aRow : CPRODUCT_TABLE)
            if (std::strcmp(aConstStr, aRow.mText) == 0) aId = aRow.mId;
    fdfTrace("fqorvOrigProdStrToID(aConstStr) = %d\n", aId);
    return aId;
}

bool fqorvOrigProdRow(int theRow, const char*& theText, int& theId)
{
    if (theRow < 0 || theRow >= CQORV_ORIG_PROD_TABLE_ROWS) return false;
    theText = CPRODUCT_TABLE[theRow].mText;
    theId = CPRODUCT_TABLE[theRow].mId;
    return true;
}
