// Multi-look of several azimuth subapertures, output line by output line: for each line the
// rectangle of every subaperture is read and combined, so memory holds al input lines and one
// output line. The MLI is written under "<MLI>_tmp" and renamed with its header at the end.
#include "qorv_AzSubaperture_multi_SLC.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "qorv_cell_types.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_multilook_kernel.h"
#include "qorv_multilook_services.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"

namespace {

struct CSubapertureParam {
    std::string mSlcName;
    std::string mMliName;
    std::string mWriteName;   // "<MLI>_tmp"
    int mRangeLooks = 1;      // rl
    int mAzimuthLooks = 1;    // al
    int mSubapertures = 1;    // nsub
    int mPresumming = 1;
    int mWidth = 0;           // W
    int mLines = 0;           // H, lines of one subaperture
};

void fUsage(const char* theProgram)
{
    fdfTrace("\nusage: %s <SLC_image> <ML_image> <proc_param> [#rlks] [#azlks] \n\n", theProgram ? theProgram : "");
}

/// Reads a header; a missing one is failure 261122.
void fReadHeader(CDescriptionHeader& theHeader, const std::string& theName)
{
    if (!theHeader.read(theName.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", theName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, theName.c_str());
    }
}

/// A look count: the argument parsed with "%d" when there is one, else the parameter file's field.
int fLooks(int argc, char** argv, int theIndex, const CDescriptionHeader& thePar, const char* theKey)
{
    int aLooks = 0;
    if (argc > theIndex && std::sscanf(argv[theIndex], "%d", &aLooks) == 1) return aLooks;
    return thePar[theKey].getInteger();
}

CSubapertureParam fSetUp(int argc, char** argv, const CDescriptionHeader& theInput, const CDescriptionHeader& thePar)
{
    CSubapertureParam aParam;
    aParam.mSlcName = argv[1];
    aParam.mMliName = argv[2];
    aParam.mWriteName = aParam.mMliName + "_tmp";
    aParam.mRangeLooks = fLooks(argc, argv, 4, thePar, "sar_processing.RgDetectionLooks");
    aParam.mAzimuthLooks = fLooks(argc, argv, 5, thePar, "sar_processing.AzDetectionLooks");
    aParam.mSubapertures = thePar["sar_processing.AzSubaperture"].getInteger();
    aParam.mPresumming = thePar["sar_processing.AzPresumming"].getInteger();
    aParam.mWidth = theInput["RasterInfo.NrOfPixelsPerLine"].getInteger();
    aParam.mLines = theInput["RasterInfo.NrOfLinesPerImage"].getInteger();
    if (aParam.mRangeLooks < 1 || aParam.mAzimuthLooks < 1 || aParam.mSubapertures < 1) {
        const std::string aText = "looks " + std::to_string(aParam.mRangeLooks) + " x " +
                                  std::to_string(aParam.mAzimuthLooks) + ", subapertures " +
                                  std::to_string(aParam.mSubapertures);
        fdfTrace("\nError: looks and subapertures must be at least 1: %s\n", aText.c_str());
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, aText.c_str());
    }
    const int aCellType = fqorvCellTypeFromName(theInput["RasterInfo.CellType"].getString());
    if (aCellType != CQORV_CELL_FLOAT_COMPLEX && aCellType != CQORV_CELL_SHORT_COMPLEX) {
        fdfTrace("Cell Type Unknow mCellType = %s\n", theInput["RasterInfo.CellType"].getString());
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, theInput["RasterInfo.CellType"].getString());
    }
    return aParam;
}

void fMakeOutputHeader(const CDescriptionHeader& theInput, const CSubapertureParam& theParam, CDescriptionHeader& theOut)
{
    const int rl = theParam.mRangeLooks;
    const int al = theParam.mAzimuthLooks;
    theOut.copyFrom(theInput, false);
    theOut["Processing.NAzimuthLooks"].setValue(al * theParam.mPresumming * theParam.mSubapertures);
    theOut["Processing.NRangeLooks"].setValue(rl);
    theOut["PixelSpacingRg"].setValue(rl * theInput["PixelSpacingRg"].getDouble());
    theOut["PixelSpacingAz"].setValue(al * theInput["PixelSpacingAz"].getDouble());
    theOut["RasterInfo.NrOfPixelsPerLine"].setValue(theParam.mWidth / rl);
    theOut["RasterInfo.NrOfLinesPerImage"].setValue(theParam.mLines / al);
    for (const char* aKey : {"RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix"})
        theOut[aKey].setValue(0);
    theOut["RasterInfo.CellType"].setValue("FLOAT");
    theOut["RasterInfo.BytesOrder"].setValue(fdfGetSetting(CQORV_DEFAULT_BYTE_ORDER));
    theOut["RasterInfo.DataUnits"].setValue("POWER");
    theOut["RasterInfo.NullCellValue"].setValue(0.0);
}

/// theCount lines from theFirst on, as fcomplex rows (16-bit complex cells converted).
void fReadRows(CRasterFile& theIn, int theFirst, int theCount, std::vector<uint8_t>& theBytes, std::vector<fcomplex>& theRows)
{
    const std::size_t aCells = static_cast<std::size_t>(theCount) * theIn.getNrOfPixels();
    theBytes.resize(aCells * theIn.getBytesPerPixel());
    theIn.readLines(theFirst, theCount, 0, theIn.getNrOfPixels() - 1, theBytes.data());
    theRows.resize(aCells);
    if (theIn.getCellType() == CQORV_CELL_FLOAT_COMPLEX) {
        std::memcpy(theRows.data(), theBytes.data(), aCells * sizeof(fcomplex));
        return;
    }
    for (std::size_t k = 0; k < aCells; ++k) {
        int16_t aPart[2];
        std::memcpy(aPart, theBytes.data() + 4 * k, sizeof(aPart));
        theRows[k] = fcomplex(aPart[0], aPart[1]);
    }
}

/// Every output line: the rectangles centred on c = al/2 + y*al while c < H - al/2, over all
/// subapertures; lines without a centre stay 0.0.
void fProcessLines(CRasterFile& theIn, CRasterFile& theOut, const CSubapertureParam& p)
{
    const int al = p.mAzimuthLooks;
    const int aOutLines = p.mLines / al;
    const int aOutWidth = p.mWidth / p.mRangeLooks;
    const double aProgressLines = std::max(1, (p.mLines - al) / al);
    fdfTrace("multilook buffer size (bytes):        %lld\n",
             static_cast<long long>(al) * p.mWidth * static_cast<long long>(sizeof(fcomplex)));
    std::vector<uint8_t> aBytes;
    std::vector<fcomplex> aRows;
    std::vector<float> aLine(static_cast<std::size_t>(aOutWidth));
    int aPercent = 0;
    for (int y = 0; y < aOutLines; ++y) {
        const int aNewPercent = static_cast<int>(y / aProgressLines * 97.0) + 1;
        if (aNewPercent != aPercent && aNewPercent < 100) {
            if (!getAndSetPerc(aPercent, aNewPercent, nullptr)) {
                fdfTrace("\n EXECUTION INTERRUPTED BY OPERATOR\n");
                QORV_FATAL(CQORV_ERR_OPERATOR_STOP, "");
            }
            aPercent = aNewPercent;
        }
        std::fill(aLine.begin(), aLine.end(), 0.0f);
        const int c = al / 2 + y * al;
        if (c < p.mLines - al / 2) {
            for (int s = 0; s < p.mSubapertures; ++s) {
                fReadRows(theIn, s * p.mLines + c - al / 2, al, aBytes, aRows);
                fqorvSubapertureLookLine(aRows.data(), al, p.mWidth, p.mRangeLooks, s, p.mSubapertures, aLine.data());
            }
        }
        theOut.writeLines(y, 1, aLine.data());
    }
}

}  // namespace

int qorv_AzSubaperture_multi_SLC(int argc, char** argv)
{
    fdfTrace("*** VDQ SAR SLC --> MULTILOOK INTENSITY IMAGE v2.4 29-oct-99 xq ***\n");
    if (argc < 4) {
        fUsage(argc > 0 ? argv[0] : nullptr);
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    std::unique_ptr<CDescriptionHeader> aInput = CDescriptionHeader::makeFull();
    fReadHeader(*aInput, std::string(argv[1]) + "_hdr");
    CDescriptionHeader aPar({"sar_processing"});
    fReadHeader(aPar, argv[3]);
    const CSubapertureParam aParam = fSetUp(argc, argv, *aInput, aPar);

    // The subapertures stand one after another: the raster holds nsub times the header's lines.
    CRasterFileParam aInParam;
    fqorvRasterParamFromHeader(*aInput, aParam.mSlcName.c_str(), aInParam);
    aInParam.mNrOfLinesPerImage = aParam.mLines * aParam.mSubapertures;
    CRasterFile aIn;
    aIn.openRead(aInParam);

    std::unique_ptr<CDescriptionHeader> aOutput = CDescriptionHeader::makeFull();
    fMakeOutputHeader(*aInput, aParam, *aOutput);
    CRasterFileParam aOutParam;
    fqorvRasterParamFromHeader(*aOutput, aParam.mWriteName.c_str(), aOutParam);
    CRasterFile aOut;
    aOut.openWrite(CQORV_RF_OPEN_WRITE, aOutParam);
    for (int s = 0; s < aParam.mSubapertures; ++s) fdfTrace("\nAZ_SUBAP PROCESSING SUBAPERTURE #%d\n", s);
    fProcessLines(aIn, aOut, aParam);
    aOut.close();
    aIn.close();

    const std::string aHeaderName = aParam.mWriteName + "_hdr";
    fdfTrace("writing new parameters to parameter file %s\n", aHeaderName.c_str());
    if (!aOutput->write(aHeaderName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aHeaderName.c_str());
    }
    fqorvRenameProduct(aParam.mWriteName.c_str(), aParam.mMliName.c_str());
    QORV_WARNING(0, "");
    return 0;
}
