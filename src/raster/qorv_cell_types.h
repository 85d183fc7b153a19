// Cell types and data units of a raster, and the complex sample types of the integer cells.
//
// A raster's cells are one of fifteen types; the name of a type is the text that
// "RasterInfo.CellType" holds, the name of a unit the text of "RasterInfo.DataUnits". The codes
// are stored in headers and index tables (ENVI data types), so they never change.
#pragma once

#include <cstdint>

#include "qorv_complex.h"

/// A complex sample of an integer cell type: real part first, as on disk.
template <typename T>
struct TQorvComplex {
    T re;
    T im;
    constexpr T real() const { return re; }
    constexpr T imag() const { return im; }
    friend constexpr bool operator==(const TQorvComplex& a, const TQorvComplex& b) { return a.re == b.re && a.im == b.im; }
};

using bcomplex = TQorvComplex<int8_t>;      // "BYTE_COMPLEX"
using ubcomplex = TQorvComplex<uint8_t>;    // "UBYTE_COMPLEX"
using scomplex = TQorvComplex<int16_t>;     // "SHORT_COMPLEX"
using uscomplex = TQorvComplex<uint16_t>;   // "UNSIGNED_SHORT_COMPLEX"

static_assert(sizeof(bcomplex) == 2 && sizeof(ubcomplex) == 2, "byte complex must be two bytes");
static_assert(sizeof(scomplex) == 4 && sizeof(uscomplex) == 4, "short complex must be four bytes");
static_assert(sizeof(fcomplex) == 8 && sizeof(dcomplex) == 16, "complex floats must be packed");

/// Cell type codes ("RasterInfo.CellType" names in comments).
enum QorvCellType : int {
    CQORV_CELL_BYTE = 0,                     // "BYTE", signed 8-bit
    CQORV_CELL_BYTE_COMPLEX = 1,             // "BYTE_COMPLEX", bcomplex
    CQORV_CELL_UNSIGNED_BYTE = 2,            // "UNSIGNED_BYTE"
    CQORV_CELL_UBYTE_COMPLEX = 3,            // "UBYTE_COMPLEX", ubcomplex
    CQORV_CELL_SHORT = 4,                    // "SHORT", signed 16-bit
    CQORV_CELL_UNSIGNED_SHORT = 5,           // "UNSIGNED_SHORT"
    CQORV_CELL_SHORT_COMPLEX = 6,            // "SHORT_COMPLEX", scomplex
    CQORV_CELL_FLOAT = 7,                    // "FLOAT", 32-bit
    CQORV_CELL_FLOAT_COMPLEX = 8,            // "FLOAT_COMPLEX", fcomplex
    CQORV_CELL_DOUBLE = 9,                   // "DOUBLE", 64-bit
    CQORV_CELL_DOUBLE_COMPLEX = 10,          // "DOUBLE_COMPLEX", dcomplex
    CQORV_CELL_UNSIGNED_INT = 11,            // "UNSIGNED_INT", 32-bit
    CQORV_CELL_INT = 12,                     // "INT", signed 32-bit
    CQORV_CELL_BIT = 13,                     // "BIT", eight pixels per byte, whole lines only
    CQORV_CELL_UNSIGNED_SHORT_COMPLEX = 14,  // "UNSIGNED_SHORT_COMPLEX", uscomplex
};
inline constexpr int CQORV_CELL_TYPE_NBR = 15;

/// Data unit codes ("RasterInfo.DataUnits" texts). Code 21 has no text and no name lookup.
enum QorvDataUnits : int {
    CQORV_UNITS_POWER = 0,
    CQORV_UNITS_AMPLITUDE = 1,
    CQORV_UNITS_SQUARE_ROOT = 2,
    CQORV_UNITS_COHERENCE = 3,
    CQORV_UNITS_INTERFEROGRAMME = 4,
    CQORV_UNITS_SLC = 5,
    CQORV_UNITS_CLASSIFICATION = 6,
    CQORV_UNITS_RATIO = 7,
    CQORV_UNITS_NUMBER = 8,
    CQORV_UNITS_OPTICAL_NUMBER = 9,
    CQORV_UNITS_ERS_RAW = 10,
    CQORV_UNITS_UNWRAPPED_PHASE = 11,
    CQORV_UNITS_DEM = 12,
    CQORV_UNITS_SLOPE = 13,
    CQORV_UNITS_SYNTHETIC_INTERFEROGRAMME = 14,
    CQORV_UNITS_FLATTENED_INTERFEROGRAMME = 15,
    CQORV_UNITS_RESOLUTION = 16,
    CQORV_UNITS_PTM_RESOLUTION = 17,
    CQORV_UNITS_CALIBRATED = 18,
    CQORV_UNITS_JERS1_RAW = 19,
    CQORV_UNITS_PHASE = 20,
    CQORV_UNITS_SIRC_RAW = 22,
    CQORV_UNITS_TRANSPLANTING = 23,
    CQORV_UNITS_BINARY_MASK = 24,
    CQORV_UNITS_VEGETATION_INDEX = 25,
    CQORV_UNITS_DMP = 26,
    CQORV_UNITS_PTM_ACCURACY = 27,
    CQORV_UNITS_ALPHA = 28,
    CQORV_UNITS_ENTROPY = 29,
    CQORV_UNITS_ANISOTROPY = 30,
    CQORV_UNITS_EDGE_MAP = 31,
    CQORV_UNITS_REGION_MERGING_MAP = 32,
    CQORV_UNITS_REGION_MERGING_MODULE = 33,
    CQORV_UNITS_LOGARITMIC = 34,
    CQORV_UNITS_LIA = 35,
    CQORV_UNITS_SRDISTANCE = 36,
    CQORV_UNITS_RADIANCE = 37,
    CQORV_UNITS_REFLECTANCE = 38,
};
inline constexpr int CQORV_DATA_UNITS_MAX = 38;

/// Name of a cell type code, or "WRONG CELL TYPE".
const char* fqorvCellTypeName(int theCellType);
/// Code of a cell type name (exact text), or -1.
int fqorvCellTypeFromName(const char* theName);
/// Bytes per cell and components per cell (1 or 2) of a code. An unknown code writes
/// "Error: unsupported raster file type " and the number to the trace, sets both to -1 and
/// returns -1; a known one returns 0.
int fqorvCellTypeSize(int theCellType, int& theBytesPerPixel, int& theDataNbr);
/// Bytes per cell of a code, -1 when unknown (no trace).
int fqorvCellTypeBytes(int theCellType);
/// True for the complex cell types (two components).
bool fqorvCellTypeIsComplex(int theCellType);

/// Text of a data unit code, or "WRONG UNITS".
const char* fqorvDataUnitsName(int theDataUnits);
/// Code of a data unit text (exact text), or -1.
int fqorvDataUnitsFromName(const char* theName);
