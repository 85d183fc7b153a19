// Typed line access: one raster line of any cell type into a buffer of the caller's element type,
// and one line from such a buffer back to the raster, with scale factors, null values and time
// directions applied on the way.
//
// Element types of the buffers: the complex samples fcomplex, dcomplex, bcomplex, ubcomplex,
// scomplex, uscomplex, and the real types float, double and the integer types.
//
// Reading (fqorvReadLine):
//   - complex buffer: real cells give (value, 0), complex cells both parts;
//   - real buffer: real cells give the value, complex cells the power re^2 + im^2 ("power form");
//     a complex cell whose two parts are both the null value stays the null value.
//   With scale factors (any of them not 1.0), a part equal to the null value (null comparison)
//   stays the null value; any other real part is multiplied by the real scale factor and any other
//   imaginary part by the imaginary one. Without them values are converted straight.
// Writing (fqorvWriteLine), one whole line:
//   - complex buffer into a real cell: the detected value re^2 + im^2 (single precision for
//     fcomplex and the integer complex types, double for dcomplex), its square root with theRoot;
//   - complex buffer into a complex cell: both parts, or with theDetect the detected value and 0;
//   - real buffer: the value (its square root with theRoot) into a real cell, (value, 0) into a
//     complex cell.
//   A non-finite value is stored as the null value. Integer cells take the machine's conversion
//   (truncation toward zero, wrapped to the cell's width). Scale factors are not applied.
// Time directions: with lines "DECREASE" row r is the file's line (lines - 1 - r); with pixels
// "DECREASE" buffer index k is the file's column (pixels - 1 - k), for reads and writes alike.
#pragma once

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <type_traits>

#include "qorv_errors.h"
#include "qorv_enviroment.h"
#include "qorv_generic_utility.h"
#include "qorv_raster_file.h"

namespace NQORV_RASTER_DETAIL {

template <typename T>
struct TBufferTraits {
    static constexpr bool mComplex = false;
    using Component = T;
};
template <typename C>
struct TBufferTraits<std::complex<C>> {
    static constexpr bool mComplex = true;
    using Component = C;
};
template <typename C>
struct TBufferTraits<TQorvComplex<C>> {
    static constexpr bool mComplex = true;
    using Component = C;
};

/// Value of a number converted to a component type: floating types directly, integer types by
/// truncation toward zero wrapped to the type's width.
template <typename T, typename W>
inline T fqorvToComponent(W theValue)
{
    if constexpr (std::is_floating_point_v<T>) {
        return static_cast<T>(theValue);
    } else {
        if (!(std::fabs(theValue) < 9.2e18)) return static_cast<T>(theValue < 0 ? std::numeric_limits<int64_t>::min()
                                                                               : std::numeric_limits<int64_t>::max());
        return static_cast<T>(static_cast<int64_t>(theValue));
    }
}

template <typename B, typename W>
inline B fqorvMakeElement(W theRe, W theIm)
{
    using C = typename TBufferTraits<B>::Component;
    if constexpr (TBufferTraits<B>::mComplex) {
        return B{fqorvToComponent<C>(theRe), fqorvToComponent<C>(theIm)};
    } else {
        (void)theIm;
        return fqorvToComponent<C>(theRe);
    }
}

template <typename C>
inline C fqorvLoad(const uint8_t* p)
{
    C v;
    std::memcpy(&v, p, sizeof(C));
    return v;
}

/// Scaling of one part: the null value stays, any other value is multiplied.
inline double fqorvScalePart(double theValue, double theScale, double theDummy)
{
    return NQORV_UTILITY::isNullValue(theValue, theDummy) ? theDummy : theValue * theScale;
}

/// Converts theCount cells of component type C (theComplex: two per cell) starting at theCells
/// into theOut, stepping theStep (+1 or -1) through the buffer.
template <typename C, bool theComplexCell, bool theScale, typename B>
void fqorvConvertCells(const uint8_t* theCells, int theCount, B* theOut, int theStep, const CRasterFile& theFile)
{
    // Work type: single precision where nothing needs more (the common raw and SLC roads), double
    // when a cell or the buffer is double or when values are scaled and compared with the null value.
    using W = std::conditional_t<theScale || std::is_same_v<C, double> ||
                                     std::is_same_v<typename TBufferTraits<B>::Component, double>,
                                 double, float>;
    const double aDummy = theFile.getDummyVal();
    const double aRealScale = theFile.getRealScaleFactor();
    const double aImagScale = theFile.getImaginaryScaleFactor();
    constexpr int aCellBytes = static_cast<int>(sizeof(C)) * (theComplexCell ? 2 : 1);
    for (int k = 0; k < theCount; ++k, theOut += theStep, theCells += aCellBytes) {
        W aRe = static_cast<W>(fqorvLoad<C>(theCells));
        W aIm = theComplexCell ? static_cast<W>(fqorvLoad<C>(theCells + sizeof(C))) : W(0);
        if constexpr (theScale) {
            aRe = fqorvScalePart(aRe, aRealScale, aDummy);
            if constexpr (theComplexCell) aIm = fqorvScalePart(aIm, aImagScale, aDummy);
        }
        if constexpr (!TBufferTraits<B>::mComplex && theComplexCell) {
            // Power form: a null cell stays null.
            if (NQORV_UTILITY::isNullValue(aRe, aDummy) && NQORV_UTILITY::isNullValue(aIm, aDummy))
                *theOut = fqorvMakeElement<B>(static_cast<W>(aDummy), W(0));
            else
                *theOut = fqorvMakeElement<B>(aRe * aRe + aIm * aIm, W(0));
        } else {
            *theOut = fqorvMakeElement<B>(aRe, aIm);
        }
    }
}

template <typename C, bool theComplexCell, typename B>
void fqorvConvertCellsScaled(const uint8_t* theCells, int theCount, B* theOut, int theStep, const CRasterFile& theFile)
{
    if (theFile.hasScaleFactor())
        fqorvConvertCells<C, theComplexCell, true>(theCells, theCount, theOut, theStep, theFile);
    else
        fqorvConvertCells<C, theComplexCell, false>(theCells, theCount, theOut, theStep, theFile);
}

/// Bits of a "BIT" line, most significant bit first, as 0 or 1.
template <typename B>
void fqorvConvertBits(const uint8_t* theLine, int theColStart, int theCount, B* theOut, int theStep)
{
    for (int k = 0; k < theCount; ++k, theOut += theStep) {
        const int aPixel = theColStart + k;
        const int aBit = (theLine[aPixel >> 3] >> (7 - (aPixel & 7))) & 1;
        *theOut = fqorvMakeElement<B>(static_cast<float>(aBit), 0.0f);
    }
}

[[noreturn]] inline void fqorvFailTypedAccess(const CRasterFile& theFile, int theColStart, int theColEnd, int theRow)
{
    theFile.print();
    fdfTrace("theColStart %d\ntheColEnd %d\nmNrOfPixelsPerLine %d\ntheRow %d\nmNrOfLinesPerImage %d\n", theColStart,
             theColEnd, theFile.getNrOfPixels(), theRow, theFile.getNrOfLines());
    QORV_FATAL(CQORV_ERR_RASTER_ACCESS,
               fqorvStringFormat("%s theColStart %d theColEnd %d mNrOfPixelsPerLine %d theRow %d mNrOfLinesPerImage %d",
                                 theFile.getFileName().c_str(), theColStart, theColEnd, theFile.getNrOfPixels(), theRow,
                                 theFile.getNrOfLines())
                   .c_str());
}

[[noreturn]] inline void fqorvFailCellType(const CRasterFile& theFile)
{
    fdfTrace("Cell Type Unknow mCellType = %d\n", theFile.getCellType());
    QORV_FATAL(CQORV_ERR_RASTER_ACCESS,
               fqorvStringFormat("Cell Type Unknow mCellType = %d", theFile.getCellType()).c_str());
}

/// Stores one value into a cell of component type C (theComplexCell: two parts).
template <typename C, bool theComplexCell, typename W>
inline void fqorvStoreCell(uint8_t* theCell, W theRe, W theIm)
{
    const C aRe = fqorvToComponent<C>(theRe);
    std::memcpy(theCell, &aRe, sizeof(C));
    if constexpr (theComplexCell) {
        const C aIm = fqorvToComponent<C>(theIm);
        std::memcpy(theCell + sizeof(C), &aIm, sizeof(C));
    }
}

/// Fills theCells with theCount cells of component type C from theIn (stepping theStep).
template <typename C, bool theComplexCell, typename B>
void fqorvFillCells(uint8_t* theCells, int theCount, const B* theIn, int theStep, bool theDetect, bool theRoot,
                    double theDummy)
{
    using BC = typename TBufferTraits<B>::Component;
    using W = std::conditional_t<std::is_same_v<BC, double>, double, float>;
    const W aDummy = static_cast<W>(theDummy);
    constexpr int aCellBytes = static_cast<int>(sizeof(C)) * (theComplexCell ? 2 : 1);
    for (int k = 0; k < theCount; ++k, theIn += theStep, theCells += aCellBytes) {
        if constexpr (TBufferTraits<B>::mComplex) {
            const W aRe = static_cast<W>(theIn->real());
            const W aIm = static_cast<W>(theIn->imag());
            if (!theComplexCell || theDetect) {
                W aDet = aRe * aRe + aIm * aIm;
                if (!std::isfinite(aDet)) aDet = aDummy;
                else if (theRoot) aDet = std::sqrt(aDet);
                fqorvStoreCell<C, theComplexCell, W>(theCells, aDet, W(0));
            } else {
                fqorvStoreCell<C, theComplexCell, W>(theCells, std::isfinite(aRe) ? aRe : aDummy,
                                                     std::isfinite(aIm) ? aIm : aDummy);
            }
        } else {
            W aValue = static_cast<W>(*theIn);
            if (!std::isfinite(aValue)) aValue = aDummy;
            else if (theRoot) aValue = std::sqrt(aValue);
            fqorvStoreCell<C, theComplexCell, W>(theCells, aValue, W(0));
        }
    }
}

/// Packs theCount values into a "BIT" line, most significant bit first: non-zero sets the bit.
template <typename B>
void fqorvFillBits(uint8_t* theLine, int theCount, const B* theIn, int theStep)
{
    std::memset(theLine, 0, static_cast<std::size_t>((theCount + 7) / 8));
    for (int k = 0; k < theCount; ++k, theIn += theStep) {
        bool aSet;
        if constexpr (TBufferTraits<B>::mComplex) aSet = theIn->real() != 0 || theIn->imag() != 0;
        else aSet = *theIn != 0;
        if (aSet) theLine[k >> 3] |= static_cast<uint8_t>(0x80 >> (k & 7));
    }
}

}  // namespace NQORV_RASTER_DETAIL

/// Reads columns theColStart..theColEnd (negative: the last pixel) of line theRow into theBuffer,
/// converted to B (see above). Rows and columns are in the raster's time directions. A range out
/// of order or outside the line, or a row outside the image, is failure 261121.
template <typename B>
void fqorvReadLine(CRasterFile& theFile, B* theBuffer, int theRow, int theColStart = 0, int theColEnd = -1)
{
    using namespace NQORV_RASTER_DETAIL;
    const int aPixels = theFile.getNrOfPixels();
    const int aLines = theFile.getNrOfLines();
    if (theColEnd < 0) theColEnd = aPixels - 1;
    if (theColStart < 0 || theColStart > theColEnd || theColEnd >= aPixels || theRow < 0 || theRow >= aLines)
        fqorvFailTypedAccess(theFile, theColStart, theColEnd, theRow);

    const int aCount = theColEnd - theColStart + 1;
    int aFirst = theColStart;
    int aLast = theColEnd;
    B* aOut = theBuffer;
    int aStep = 1;
    if (theFile.isPixelsTimeDecrease()) {
        aFirst = aPixels - 1 - theColEnd;
        aLast = aPixels - 1 - theColStart;
        aOut = theBuffer + (aCount - 1);
        aStep = -1;
    }
    const int aRow = theFile.isLinesTimeDecrease() ? aLines - 1 - theRow : theRow;
    const uint8_t* aCells = theFile.getLine(aRow, aFirst, aLast);

    switch (theFile.getCellType()) {
    case CQORV_CELL_BYTE: fqorvConvertCellsScaled<int8_t, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_BYTE_COMPLEX: fqorvConvertCellsScaled<int8_t, true>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_UNSIGNED_BYTE: fqorvConvertCellsScaled<uint8_t, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_UBYTE_COMPLEX: fqorvConvertCellsScaled<uint8_t, true>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_SHORT: fqorvConvertCellsScaled<int16_t, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_UNSIGNED_SHORT: fqorvConvertCellsScaled<uint16_t, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_SHORT_COMPLEX: fqorvConvertCellsScaled<int16_t, true>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_FLOAT: fqorvConvertCellsScaled<float, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_FLOAT_COMPLEX: fqorvConvertCellsScaled<float, true>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_DOUBLE: fqorvConvertCellsScaled<double, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_DOUBLE_COMPLEX: fqorvConvertCellsScaled<double, true>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_UNSIGNED_INT: fqorvConvertCellsScaled<uint32_t, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_INT: fqorvConvertCellsScaled<int32_t, false>(aCells, aCount, aOut, aStep, theFile); break;
    case CQORV_CELL_BIT: fqorvConvertBits(aCells, aFirst, aCount, aOut, aStep); break;
    case CQORV_CELL_UNSIGNED_SHORT_COMPLEX:
        fqorvConvertCellsScaled<uint16_t, true>(aCells, aCount, aOut, aStep, theFile);
        break;
    default: fqorvFailCellType(theFile);
    }
}

/// Writes one whole line theRow (in the raster's lines time direction) from theBuffer of
/// NrOfPixelsPerLine elements; theDetect stores the detected value in a complex cell, theRoot its
/// square root. A row outside the image is failure 261121.
template <typename B>
void fqorvWriteLine(CRasterFile& theFile, const B* theBuffer, int theRow, bool theDetect = false, bool theRoot = false)
{
    using namespace NQORV_RASTER_DETAIL;
    const int aPixels = theFile.getNrOfPixels();
    const int aLines = theFile.getNrOfLines();
    if (theRow < 0 || theRow >= aLines) fqorvFailTypedAccess(theFile, 0, aPixels - 1, theRow);
    const int aRow = theFile.isLinesTimeDecrease() ? aLines - 1 - theRow : theRow;
    const B* aIn = theBuffer;
    int aStep = 1;
    if (theFile.isPixelsTimeDecrease()) {
        aIn = theBuffer + (aPixels - 1);
        aStep = -1;
    }
    uint8_t* aCells = theFile.pixelBuffer();
    const double aDummy = theFile.getDummyVal();

    switch (theFile.getCellType()) {
    case CQORV_CELL_BYTE: fqorvFillCells<int8_t, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_BYTE_COMPLEX: fqorvFillCells<int8_t, true>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_UNSIGNED_BYTE: fqorvFillCells<uint8_t, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_UBYTE_COMPLEX: fqorvFillCells<uint8_t, true>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_SHORT: fqorvFillCells<int16_t, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_UNSIGNED_SHORT: fqorvFillCells<uint16_t, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_SHORT_COMPLEX: fqorvFillCells<int16_t, true>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_FLOAT: fqorvFillCells<float, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_FLOAT_COMPLEX: fqorvFillCells<float, true>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_DOUBLE: fqorvFillCells<double, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_DOUBLE_COMPLEX: fqorvFillCells<double, true>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_UNSIGNED_INT: fqorvFillCells<uint32_t, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_INT: fqorvFillCells<int32_t, false>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy); break;
    case CQORV_CELL_BIT: fqorvFillBits(aCells, aPixels, aIn, aStep); break;
    case CQORV_CELL_UNSIGNED_SHORT_COMPLEX:
        fqorvFillCells<uint16_t, true>(aCells, aPixels, aIn, aStep, theDetect, theRoot, aDummy);
        break;
    default: fqorvFailCellType(theFile);
    }
    theFile.putLine(aRow);
}
