// Small rasters with their headers for the export tests, written with the store and the raster file.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "qorv_description_section.h"
#include "qorv_raster_file.h"
#include "tools_raster_file_exp.h"

namespace etest {

/// Writes theName (cells of theCellType, null -9999) and theName.sml; cell (r, c) = theValue(r, c).
inline void writeRaster(const std::string& theName, int theLines, int thePixels, const char* theCellType,
                        const char* theUnits, const std::function<fcomplex(int, int)>& theValue,
                        const char* theByteOrder = "LSBF", int theRowPrefix = 0)
{
    auto h = CDescriptionHeader::makeFull();
    (*h)["RasterInfo.NrOfLinesPerImage"].setValue(theLines);
    (*h)["RasterInfo.NrOfPixelsPerLine"].setValue(thePixels);
    (*h)["RasterInfo.CellType"].setValue(theCellType);
    (*h)["RasterInfo.DataUnits"].setValue(theUnits);
    (*h)["RasterInfo.BytesOrder"].setValue(theByteOrder);
    (*h)["RasterInfo.HeaderOffset"].setValue(0);
    (*h)["RasterInfo.RowPrefix"].setValue(theRowPrefix);
    (*h)["RasterInfo.RowSuffix"].setValue(0);
    (*h)["RasterInfo.NullCellValue"].setValue(-9999.0);
    ASSERT_TRUE(h->write((theName + "_hdr").c_str(), true, false));
    CRasterFileParam p;
    fqorvRasterParamFromHeader(*h, theName.c_str(), p);
    CRasterFile f;
    f.openWrite(CQORV_RF_OPEN_WRITE, p);
    std::vector<fcomplex> aLine(static_cast<std::size_t>(thePixels));
    std::vector<float> aReal(static_cast<std::size_t>(thePixels));  // a complex buffer would be detected
    for (int r = 0; r < theLines; ++r) {
        for (int c = 0; c < thePixels; ++c) aReal[c] = (aLine[c] = theValue(r, c)).real();
        if (fqorvCellTypeIsComplex(p.mCellType)) fqorvWriteLine(f, aLine.data(), r);
        else fqorvWriteLine(f, aReal.data(), r);
    }
    f.close();
}

/// Every cell of a raster as complex values (real cells: (v, 0)), row by row.
inline std::vector<fcomplex> readRaster(const std::string& theName, std::unique_ptr<CDescriptionHeader>* theHeader = nullptr)
{
    auto h = CDescriptionHeader::makeFull();
    EXPECT_TRUE(h->read(theName.c_str(), true));
    CRasterFileParam p;
    fqorvRasterParamFromHeader(*h, theName.c_str(), p);
    CRasterFile f;
    f.openRead(p);
    std::vector<fcomplex> aAll(static_cast<std::size_t>(f.getNrOfLines()) * f.getNrOfPixels());
    for (int r = 0; r < f.getNrOfLines(); ++r) fqorvReadLine(f, aAll.data() + static_cast<std::size_t>(r) * f.getNrOfPixels(), r);
    f.close();
    if (theHeader) *theHeader = std::move(h);
    return aAll;
}

}  // namespace etest
