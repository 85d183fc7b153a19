// Cell type and data unit tables.
#include "qorv_cell_types.h"

#include <cstring>

#include "qorv_enviroment.h"

namespace {

struct CellTypeRow {
    const char* mName;
    int mBytes;
    int mComponents;
};

// Indexed by the cell type code.
constexpr CellTypeRow CQORV_CELL_TABLE[CQORV_CELL_TYPE_NBR] = {
    {"BYTE", 1, 1},
    {"BYTE_COMPLEX", 2, 2},
    {"UNSIGNED_BYTE", 1, 1},
    {"UBYTE_COMPLEX", 2, 2},
    {"SHORT", 2, 1},
    {"UNSIGNED_SHORT", 2, 1},
    {"SHORT_COMPLEX", 4, 2},
    {"FLOAT", 4, 1},
    {"FLOAT_COMPLEX", 8, 2},
    {"DOUBLE", 8, 1},
    {"DOUBLE_COMPLEX", 16, 2},
    {"UNSIGNED_INT", 4, 1},
    {"INT", 4, 1},
    {"BIT", 1, 1},
    {"UNSIGNED_SHORT_COMPLEX", 4, 2},
};

// Indexed by the data unit code; code 21 has no text.
constexpr const char* CQORV_UNITS_TABLE[CQORV_DATA_UNITS_MAX + 1] = {
    "POWER", "AMPLITUDE", "SQUARE ROOT", "COHERENCE", "INTERFEROGRAMME", "SLC", "CLASSIFICATION",
    "RATIO", "NUMBER", "OPTICAL NUMBER", "ERS RAW", "UNWRAPPED PHASE", "DEM", "SLOPE",
    "SYNTHETIC INTERFEROGRAMME", "FLATTENED INTERFEROGRAMME", "RESOLUTION", "PTM RESOLUTION",
    "CALIBRATED", "JERS 1 RAW", "PHASE", nullptr, "SIR-C RAW", "TRANSPLANTING", "BINARY_MASK",
    "VEGETATION_INDEX", "DMP", "PTM ACCURACY", "ALPHA", "ENTROPY", "ANISOTROPY", "EDGE MAP",
    "REGION MERGING MAP", "REGION MERGING MODULE", "LOGARITMIC", "LIA", "SRDISTANCE", "RADIANCE",
    "REFLECTANCE",
};

bool isKnownCellType(int theCellType) { return theCellType >= 0 && theCellType < CQORV_CELL_TYPE_NBR; }

}  // namespace

const char* fqorvCellTypeName(int theCellType)
{
    return isKnownCellType(theCellType) ? CQORV_CELL_TABLE[theCellType].mName : "WRONG CELL TYPE";
}

int fqorvCellTypeFromName(const char* theName)
{
    if (theName == nullptr) return -1;
    for (int i = 0; i < CQORV_CELL_TYPE_NBR; ++i)
        if (std::strcmp(theName, CQORV_CELL_TABLE[i].mName) == 0) return i;
    return -1;
}

int fqorvCellTypeSize(int theCellType, int& theBytesPerPixel, int& theDataNbr)
{
    if (!isKnownCellType(theCellType)) {
        fdfTrace("Error: unsupported raster file type %d\n", theCellType);
        theBytesPerPixel = -1;
        theDataNbr = -1;
        return -1;
    }
    theBytesPerPixel = CQORV_CELL_TABLE[theCellType].mBytes;
    theDataNbr = CQORV_CELL_TABLE[theCellType].mComponents;
    return 0;
}

int fqorvCellTypeBytes(int theCellType)
{
    return isKnownCellType(theCellType) ? CQORV_CELL_TABLE[theCellType].mBytes : -1;
}

bool fqorvCellTypeIsComplex(int theCellType)
{
    return isKnownCellType(theCellType) && CQORV_CELL_TABLE[theCellType].mComponents == 2;
}

const char* fqorvDataUnitsName(int theDataUnits)
{
    if (theDataUnits < 0 || theDataUnits > CQORV_DATA_UNITS_MAX || CQORV_UNITS_TABLE[theDataUnits] == nullptr)
        return "WRONG UNITS";
    return CQORV_UNITS_TABLE[theDataUnits];
}

int fqorvDataUnitsFromName(const char* theName)
{
    if (theName == nullptr) return -1;
    for (int i = 0; i <= CQORV_DATA_UNITS_MAX; ++i)
        if (CQORV_UNITS_TABLE[i] != nullptr && std::strcmp(theName, CQORV_UNITS_TABLE[i]) == 0) return i;
    return -1;
}
