// Raster parameters from the parameter store.
#include <cstring>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_raster_file.h"

namespace {

// A field that holds a value, or null (a field the header does not have counts as unset).
const CDescriptionField* setField(const CDescriptionHeader& theHeader, const char* theKey)
{
    const CDescriptionField* aField = theHeader.findField(theKey);
    return aField != nullptr && aField->isInitialised() ? aField : nullptr;
}

bool isDecrease(const CDescriptionHeader& theHeader, const char* theKey)
{
    const CDescriptionField* aField = setField(theHeader, theKey);
    return aField != nullptr && std::strcmp(aField->getString(), "DECREASE TIME DIRECTION") == 0;
}

}  // namespace

void fqorvRasterParamFromHeader(const CDescriptionHeader& theHeader, const char* theFileName,
                                CRasterFileParam& theParam)
{
    theParam = CRasterFileParam{};
    theParam.mFileName = theFileName != nullptr ? theFileName : "";
    theParam.mNrOfLinesPerImage = theHeader["RasterInfo.NrOfLinesPerImage"].getInteger();
    theParam.mNrOfPixelsPerLine = theHeader["RasterInfo.NrOfPixelsPerLine"].getInteger();
    theParam.mCellType = fqorvCellTypeFromName(theHeader["RasterInfo.CellType"].getString());
    if (const CDescriptionField* aUnits = setField(theHeader, "RasterInfo.DataUnits"))
        theParam.mDataUnits = fqorvDataUnitsFromName(aUnits->getString());
    theParam.mHeaderLen = theHeader["RasterInfo.HeaderOffset"].getInteger();
    theParam.mRowPrefix = theHeader["RasterInfo.RowPrefix"].getInteger();
    theParam.mRowSuffix = theHeader["RasterInfo.RowSuffix"].getInteger();
    if (const CDescriptionField* aFooter = setField(theHeader, "RasterInfo.FooterLen"))
        theParam.mFooterLen = aFooter->getInteger();
    theParam.mDummyVal = theHeader["RasterInfo.NullCellValue"].getDouble();

    std::string aOrder;
    if (const CDescriptionField* aBytesOrder = setField(theHeader, "RasterInfo.BytesOrder"))
        aOrder = aBytesOrder->getString();
    else
        aOrder = fdfGetSetting(CQORV_DEFAULT_BYTE_ORDER);
    theParam.mByteOrderMSBF = aOrder == "MSBF";

    if (const CDescriptionField* aReal = setField(theHeader, "RasterInfo.RealScaleFactor"))
        theParam.mRealScaleFactor = aReal->getDouble();
    if (const CDescriptionField* aImaginary = setField(theHeader, "RasterInfo.ImaginaryScaleFactor"))
        theParam.mImaginaryScaleFactor = aImaginary->getDouble();
    theParam.mLinesTimeDecrease = isDecrease(theHeader, "InitialGeometry.TimeDirectionLines");
    theParam.mPixelsTimeDecrease = isDecrease(theHeader, "InitialGeometry.TimeDirectionPixel");
}
