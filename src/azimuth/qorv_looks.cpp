#include "qorv_looks.h"

#include <algorithm>
#include <cmath>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_fft.h"
#include "qorv_generic_utility.h"
#include "qorv_identifiers.h"
#include "qorv_omegak_kernel.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "qorv_read_write_info.h"
#include "qorv_subaperture_filter.h"
#include "tools_raster_file_exp.h"

namespace {

int fLargestPowerOfTwo(double theLimit)
{
    int p = 1;
    while (2.0 * p <= theLimit) p *= 2;
    return p;
}

/// One look: filtered around its centroid, focused without weights, the middle half of the rows
/// detected into theImage.
void fLook(CRasterFile& theIn, const CLookRun& r, COmegaKBlockFocuser& theFocuser, int i, const char* theTitle,
           std::vector<fcomplex>& theImage)
{
    fdfTrace("\n%s%d\n", theTitle, i);
    const double fdc = r.lookCentroid(i);
    double ws = 0.0, ws1 = 0.0, ws2 = 0.0;
    fqorvSubapertureAngles(r.mGeometry, fdc, ws, ws1, ws2);

    std::vector<fcomplex> aLine(static_cast<std::size_t>(r.mWidth));
    const QorvLineReader aRead = [&](int theLine, fcomplex* theRow) {
        fqorvReadLine(theIn, aLine.data(), theLine);
        std::copy(aLine.begin() + r.mColumn0, aLine.begin() + r.mColumn0 + r.w, theRow);
    };
    CSubapertureFilter aFilter(r.ndec, r.w, nullptr);
    aFilter.fill(aRead, r.mLines, r.mOffset, r.mGeometry.mFilterBandwidthRad, ws1, theFocuser.block());
    theFocuser.setDoppler(fdc, fqorvDopplerBin(ws2, r.nazft), 0.0);
    theFocuser.setUniformWeights();
    theFocuser.focus();

    const CQorvMatrix<fcomplex>& b = theFocuser.block();
    theImage.assign(static_cast<std::size_t>(r.lookRows()) * r.w, fcomplex(0.0f, 0.0f));
    for (int row = r.nazft / 4, o = 0; row < 3 * r.nazft / 4; ++row, ++o)
        for (int n = 0; n < r.w; ++n) theImage[static_cast<std::size_t>(o) * r.w + n] = fcomplex(std::abs(b[row][n]), 0.0f);
}

}  // namespace

double CLookRun::lookCentroid(int i) const
{
    return (mGeometry.mIn.mBandFraction * prf() / (psf * CQORV_LOOKS)) * (i - (CQORV_LOOKS - 1) / 2.0) + fd;
}

int fqorvLookFftSize(const CDescriptionHeader& theInput, int theLines, int thePresumming, int theDecimation,
                     bool theFixedForOthers)
{
    const double L = static_cast<double>(theLines) / (thePresumming * theDecimation);
    const int p = std::min(4096, fLargestPowerOfTwo(L));
    std::string aOrigin;
    if (!fqorvGetUserKey(theInput, "ORIGIN DATA", aOrigin)) return p;
    const int aProduct = fqorvOrigProdStrToID(aOrigin.c_str());
    const int m = std::max(512, static_cast<int>(L / 512.0) * 512);
    if (aProduct == CQORV_ORIG_PROD_ALOS_PALSAR_FBS10_ID) {
        fdfTrace("CQORV_JERS1_AUTO_FFT : %d\n", 24576);
        return std::min(24576, m);
    }
    for (int id : {22, 37, 39, 105, 106, 107})
        if (aProduct == id) {
            fdfTrace("CQORV_JERS1_AUTO_FFT : %d\n", 16384);
            return std::min(16384, m);
        }
    return theFixedForOthers ? 4096 : p;
}

void fqorvLookSetUp(const CDescriptionHeader& theInput, const CDescriptionHeader& thePar, const CGeometryVariant& theVariant,
                    int theWidthLimit, CLookRun& r)
{
    r.mWidth = theInput["RasterInfo.NrOfPixelsPerLine"].getInteger();
    r.mLines = theInput["RasterInfo.NrOfLinesPerImage"].getInteger();
    r.w = std::min(r.mWidth, theWidthLimit);
    r.mColumn0 = r.mWidth / 2 - r.w / 2;
    if (r.nazft < 4) {
        fdfTrace("Error: azimuth FFT size %d\n", r.nazft);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "azimuth FFT size");
    }
    const CGeometryInput aIn = fqorvReadGeometryInput(theInput, thePar, theVariant, r.psf, r.ndec, r.mInput + "_hdr");
    YDF_SAR aSar;
    read_image_info(r.mInput.c_str(), aSar);
    double aPixel = 0.0, aLine = 0.0;
    theVariant.dopplerPosition(r.mWidth, r.w, r.mOffset, r.nfir, r.ndec, r.nazft, r.mLines - 1, aPixel, aLine);
    r.fd = aSar.getDopplerFromPixel(aPixel, aLine, false, false);
    r.mGeometry = fqorvSpaceborneGeometry(aIn, r.fd);
}

void fqorvFocusLooks(CRasterFile& theIn, const CLookRun& r, const char* theTitle, std::vector<fcomplex>& theFirst,
                     std::vector<fcomplex>& theLast)
{
    const COmegaKParam k = fqorvBlockParam(r.mGeometry, r.nazft, r.w, r.mColumn0);
    const int aThreads = fqorvThreadCount();
    fqorvFftSetThreads(aThreads);
    COmegaKBlockFocuser aFocuser(k, aThreads);
    int aPercent = 0;
    for (int i = 0; i < CQORV_LOOKS; i += CQORV_LOOKS - 1) {
        fdfProgress(aPercent, 1 + i * 90 / CQORV_LOOKS, 100);
        fLook(theIn, r, aFocuser, i, theTitle, i == 0 ? theFirst : theLast);
    }
}
