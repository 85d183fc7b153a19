#include "qorv_irf_slc.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>

#include "qorv_cell_types.h"
#include "qorv_description_section.h"
#include "qorv_raster_file.h"
#include "tools_raster_file_exp.h"

namespace {

std::string number(double theValue)
{
    char aBuffer[64];
    std::snprintf(aBuffer, sizeof aBuffer, "%.3f", theValue);
    return aBuffer;
}

/// The processed azimuth bandwidth: the option, else the header's field when set, else 0.8.
double azimuthFraction(const CDescriptionHeader& theHeader, double theOption)
{
    if (theOption > 0.0) return theOption;
    const CDescriptionField* aField = theHeader.findField("sar_processing.AzBandWidthFraction");
    if (aField && aField->isInitialised() && aField->getDouble() > 0.0 && aField->getDouble() <= 1.0)
        return aField->getDouble();
    return CQORV_IRF_DEFAULT_AZ_FRACTION;
}

/// Reads the square region of a target from the raster; samples outside the image stay zero.
/// Returns whether the region reached past the image.
bool readRegion(CRasterFile& theFile, CIrfChip& theRegion, std::vector<fcomplex>& theLine)
{
    const int aLines = theFile.getNrOfLines();
    const int aPixels = theFile.getNrOfPixels();
    const int p0 = std::max(theRegion.mPixel0, 0);
    const int p1 = std::min(theRegion.mPixel0 + theRegion.mPixels, aPixels) - 1;
    bool aOutside = p0 != theRegion.mPixel0 || p1 != theRegion.mPixel0 + theRegion.mPixels - 1;
    for (int l = 0; l < theRegion.mLines; ++l) {
        const int aRow = theRegion.mLine0 + l;
        if (aRow < 0 || aRow >= aLines) {
            aOutside = true;
            continue;
        }
        if (p1 < p0) continue;
        fqorvReadLine(theFile, theLine.data(), aRow, p0, p1);
        std::copy(theLine.begin(), theLine.begin() + (p1 - p0 + 1), &theRegion.at(l, p0 - theRegion.mPixel0));
    }
    return aOutside;
}

/// Whether the window finally cut around the peak reaches past the image.
bool windowOutside(const CIrfResponse& theResponse, const CIrfOptions& theOptions, int theLines, int thePixels)
{
    const int h = theOptions.mWindow / 2;
    const long l = std::lround(theResponse.mLine);
    const long p = std::lround(theResponse.mPixel);
    return l - h < 0 || l + h > theLines || p - h < 0 || p + h > thePixels;
}

}  // namespace

CIrfReport fqorvIrfAnalyseSlc(const std::string& theSlc, const CIrfTruth& theTruth, const std::string& theTruthPath,
                              const CIrfRunOptions& theOptions)
{
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    if (!aHeader->read((theSlc + "_hdr").c_str(), false))
        throw CIrfInputError("cannot read the header of " + theSlc + " (" + theSlc + ".sml or " + theSlc + "_hdr)");
    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(*aHeader, theSlc.c_str(), aParam);
    if (!fqorvCellTypeIsComplex(aParam.mCellType))
        throw CIrfInputError(theSlc + " is not a complex raster (RasterInfo.CellType " +
                             (*aHeader)["RasterInfo.CellType"].getString() + ")");

    CIrfReport aReport;
    aReport.mSlc = theSlc;
    aReport.mTruthPath = theTruthPath;
    aReport.mTruth = theTruth;
    aReport.mOptions = theOptions.mMeasure;
    aReport.mImageLines = aParam.mNrOfLinesPerImage;
    aReport.mImagePixels = aParam.mNrOfPixelsPerLine;
    const double aFraction = azimuthFraction(*aHeader, theOptions.mAzFraction);
    aReport.mIdeal = fqorvIrfIdealForTruth(theTruth, aFraction, theOptions.mMeasure.mUpsample,
                                           theOptions.mPatternVelocity);

    // Every target must lie in the image before anything is measured.
    for (const CIrfTarget& t : theTruth.mTargets) {
        if (theOptions.mOnlyIsolated && !t.mIsolated) continue;
        if (!(t.mLine >= -0.5 && t.mLine < aReport.mImageLines - 0.5 && t.mPixel >= -0.5 &&
              t.mPixel < aReport.mImagePixels - 0.5))
            throw CIrfInputError("target " + t.mId + " at line " + number(t.mLine) + ", pixel " + number(t.mPixel) +
                                 " lies outside the image of " + std::to_string(aReport.mImageLines) + " lines x " +
                                 std::to_string(aReport.mImagePixels) + " pixels");
    }

    CRasterFile aFile;
    aFile.openRead(aParam);
    std::vector<fcomplex> aLine(aParam.mNrOfPixelsPerLine);
    const double kNaN = std::numeric_limits<double>::quiet_NaN();
    for (const CIrfTarget& t : theTruth.mTargets) {
        if (theOptions.mOnlyIsolated && !t.mIsolated) continue;
        int aLine0 = 0;
        int aPixel0 = 0;
        int aSize = 0;
        fqorvIrfRegion(t.mLine, t.mPixel, theOptions.mMeasure, aLine0, aPixel0, aSize);
        CIrfChip aRegion(aSize, aSize, aLine0, aPixel0);
        const bool aOutside = readRegion(aFile, aRegion, aLine);

        CIrfTargetResult aResult;
        aResult.mTarget = t;
        // The spectrum centres are estimated from each window: they are what the focuser made.
        aResult.mResponse = fqorvIrfAnalyseTarget(aRegion, t.mLine, t.mPixel, theOptions.mMeasure, kNaN, kNaN);
        aResult.mResponse.mTouchesEdge =
            aOutside && windowOutside(aResult.mResponse, theOptions.mMeasure, aReport.mImageLines, aReport.mImagePixels);
        fqorvIrfCompare(aResult);
        aReport.mTargets.push_back(aResult);
    }
    aFile.close();
    return aReport;
}
