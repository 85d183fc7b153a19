// Step 4, Doppler ambiguity. Stages: set-up (arguments, headers, sizes, geometry), the two looks and
// their byte images, the two-dimensional correlation, the ambiguity number, the corrected header.
#include "qorv_doppler_ambiguity.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_fft.h"
#include "qorv_generic_utility.h"
#include "qorv_looks.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "qorv_read_write_info.h"
#include "tools_raster_file_exp.h"

namespace {

constexpr int CQORV_AMB_MAX_WIDTH = 1024;
constexpr double CSAR_C = 299792458.0;

/// Writes a detected look as bytes: 63.75 / mean of the non-zero cells, clipped at 255; with no
/// such cell the mean is taken as 1.0.
void fWriteLook(const CDescriptionHeader& theInput, const std::string& theName, const std::vector<fcomplex>& theImage,
                int theRows, int theColumns)
{
    auto h = CDescriptionHeader::makeFull();
    h->copyFrom(theInput, false);
    for (const char* aKey : {"RasterInfo.FooterLen", "RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix"})
        (*h)[aKey].setValue(0);
    (*h)["RasterInfo.CellType"].setValue("UNSIGNED_BYTE");
    (*h)["RasterInfo.NullCellValue"].setValue(0.0);
    (*h)["RasterInfo.DataUnits"].setValue("POWER");
    (*h)["RasterInfo.NrOfPixelsPerLine"].setValue(theColumns);
    (*h)["RasterInfo.NrOfLinesPerImage"].setValue(theRows);
    if (!h->write((theName + "_hdr").c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", (theName + "_hdr").c_str());
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, (theName + "_hdr").c_str());
    }
    double aSum = 0.0;
    long long n = 0;
    for (const fcomplex& z : theImage)
        if (z.real() != 0.0f) {
            aSum += z.real();
            ++n;
        }
    double aMean = 1.0;
    if (n == 0) {
        fdfTrace("Error: 0 non null points in output file %s\n", theName.c_str());
    } else {
        aMean = aSum / static_cast<double>(n);
    }
    const double aFactor = 63.75 / aMean;
    CRasterFileParam p;
    fqorvRasterParamFromHeader(*h, theName.c_str(), p);
    CRasterFile f;
    f.openWrite(CQORV_RF_OPEN_WRITE, p);
    std::vector<float> aLine(static_cast<std::size_t>(theColumns));
    for (int r = 0; r < theRows; ++r) {
        for (int c = 0; c < theColumns; ++c)
            aLine[static_cast<std::size_t>(c)] =
                std::trunc(std::min(255.0, theImage[static_cast<std::size_t>(r) * theColumns + c].real() * aFactor));
        fqorvWriteLine(f, aLine.data(), r);
    }
    f.close();
}

/// Adds theCycles PRF cycles to the constant term of the Doppler table in the form at hand.
void fApplyAmbiguity(CDescriptionHeader& h, int theCycles, double thePrf)
{
    CDescriptionField& c = h["Processing.DopCenRangeCoeff"];
    if (!c.isInitialised()) return;
    const bool aTable = fqorvHasValue(h, "Processing.DopplerEstimatedFlag") &&
                        std::strcmp(h["Processing.DopplerEstimatedFlag"].getString(), "OK") == 0;
    const int aColumn = aTable ? 2 : 0;
    const double aBefore = c.getDouble(0, aColumn);
    fdfTrace("Original near range Doppler Centroid value: %f\n", aBefore);
    fdfTrace("Updated:                                    %f\n", aBefore + theCycles * thePrf);
    for (int r = 0; r < (aTable ? c.getNbrOfRows() : 1); ++r) c.setValue(r, aColumn, c.getDouble(r, aColumn) + theCycles * thePrf);
}

void fWriteHeader(CDescriptionHeader& h, const std::string& theName)
{
    fdfTrace("writing new parameters to parameter file %s\n", theName.c_str());
    if (!h.write(theName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", theName.c_str());
        QORV_FATAL(CQORV_ERR_WRITE_FILE, theName.c_str());
    }
}

}  // namespace

void fqorvLookShift2D(std::vector<fcomplex>& theFirst, std::vector<fcomplex>& theSecond, int theRows, int theColumns,
                      int& theRangeShift, int& theAzimuthShift)
{
    const float aScale = static_cast<float>(1.0 / (static_cast<double>(theColumns) * theRows));
    const FftPlan2D aForward(theRows, theColumns, FftDirection::Forward);
    const FftPlan2D aInverse(theRows, theColumns, FftDirection::Inverse);
    aForward.execute(theFirst.data());
    aForward.execute(theSecond.data());
    fdfTrace("Cross-multiplying the spectra \n");
    for (std::size_t k = 0; k < theFirst.size(); ++k) theFirst[k] = aScale * theFirst[k] * std::conj(theSecond[k]);
    fdfTrace("Transforming the cross-spectrum back \n");
    aInverse.execute(theFirst.data());
    fdfTrace("Finding the cross-correlation maximum \n");
    std::size_t aPeak = 0;
    float aMax = -1.0f;
    for (std::size_t k = 0; k < theFirst.size(); ++k)
        if (std::norm(theFirst[k]) > aMax) {
            aMax = std::norm(theFirst[k]);
            aPeak = k;
        }
    theRangeShift = static_cast<int>(aPeak % static_cast<std::size_t>(theColumns));
    theAzimuthShift = static_cast<int>(aPeak / static_cast<std::size_t>(theColumns));
    if (theRangeShift > theColumns / 2) theRangeShift -= theColumns;
    if (theAzimuthShift > theRows / 2) theAzimuthShift -= theRows;
    fdfTrace("Estimated range shift:   %d\nEstimated azimuth shift: %d\n", theRangeShift, theAzimuthShift);
}

double fqorvAmbiguityNumber(double theRangeShift, double theFmRate, double theSpacing, double theWavelength, double thePrf,
                            double theDopplerDifference)
{
    return (2.0 * theFmRate * theRangeShift * theSpacing) / (theWavelength * thePrf * theDopplerDifference);
}

int qorv_doppler_ambiguity(int argc, char** argv)
{
    fdfTrace("*** SAR Doppler ambiguity resolver v2.3 25-mar-99 xq ***\n");
    if (argc < 3) {
        fdfTrace("\nusage: %s <rc_data> <proc_par> [prefilter] [az_FFT] [az_offset] \n\n", argc > 0 ? argv[0] : "");
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "");
    }
    CLookRun r;
    r.mInput = argv[1];
    const std::string aParFile = argv[2], aHeaderName = r.mInput + "_hdr";
    std::unique_ptr<CDescriptionHeader> aInput =
        fqorvReadStepHeader(aHeaderName, "Error: missing parameter file ", false);
    if (fqorvHasValue(*aInput, "Processing.UserSkipDopplerEst")) {
        fdfTrace("Skipp doppler ambiguity\n");
        return 0;
    }
    std::unique_ptr<CDescriptionHeader> aPar =
        fqorvReadStepHeader(aParFile, "Error: missing processing parameter file ", true);
    CDescriptionHeader& in = *aInput;
    const int aLines = (*aPar)["sar_processing.ProcessedLines"].getInteger();
    if (argc > 3) r.psf = std::max(1, std::atoi(argv[3]));
    r.nazft = fqorvLookFftSize(in, aLines, r.psf, r.ndec, false);
    if (argc > 4 && std::atoi(argv[4]) > 0) r.nazft = std::atoi(argv[4]);
    fdfTrace("AFTER nazft = %d\n", r.nazft);
    if (fqorvHasValue(in, "Processing.LineEstimationAmbiguity")) {
        r.mOffset = in["Processing.LineEstimationAmbiguity"].getInteger();
    } else if (fqorvHasValue(in, "Processing.LineEstimationVelocity")) {
        r.mOffset = in["Processing.LineEstimationVelocity"].getInteger();
    }
    const double v = (*aPar)["sar_processing.Velocity"].getDouble();
    in["Processing.ProcessingVelocity"].setValue(0, v);
    fqorvLookSetUp(in, *aPar, CQORV_GEOMETRY_AMBIGUITY, CQORV_AMB_MAX_WIDTH, r);

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(in, r.mInput.c_str(), aParam);
    CRasterFile aIn;
    aIn.openRead(aParam);
    std::vector<fcomplex> aFirst, aLast;
    fqorvFocusLooks(aIn, r, "DA START L PROCESSING SUBAPERTURE #", aFirst, aLast);
    aIn.close();
    QorvString aLook1(fqorvJoin(r.mInput.c_str(), "_amb1_mli")), aLook2(fqorvJoin(r.mInput.c_str(), "_amb2_mli"));
    fWriteLook(in, aLook1.get(), aFirst, r.lookRows(), r.w);
    fWriteLook(in, aLook2.get(), aLast, r.lookRows(), r.w);

    int aRangeShift = 0, aAzimuthShift = 0;
    fqorvLookShift2D(aFirst, aLast, r.lookRows(), r.w, aRangeShift, aAzimuthShift);
    const double dop1 = r.lookCentroid(0), dop2 = r.lookCentroid(CQORV_LOOKS - 1);
    const double ka = r.mGeometry.fmRateSquinted(dop2);
    const double aLambda = CSAR_C / r.mGeometry.mIn.mCarrierFrequency;
    const double n = fqorvAmbiguityNumber(aRangeShift, ka, r.mGeometry.mRangeSpacing, aLambda, r.prf(), dop2 - dop1);
    const int i_dop = static_cast<int>(n >= 0.0 ? std::floor(n + 0.5) : -std::floor(-n + 0.5));
    fdfTrace("Estimated missing number of Doppler ambiguities: %f, rounded: %d\n", n, i_dop);

    fApplyAmbiguity(in, i_dop, r.prf());
    fWriteHeader(in, aHeaderName);
    YDF_SAR aSar;
    read_image_info(r.mInput.c_str(), aSar);
    fqorvSetUserKey(in, "DOPPLER VALUE AFTER AMBIGUITY CORRECTION (0   0)",
                    fqorvStringFormat("%lf", aSar.getDopplerFromPixel(0.0, 0.0, false, false)).c_str());
    in["Processing.ProcessingVelocity"].setValue(0, v);
    fWriteHeader(in, aHeaderName);
    getAndSetPerc(-1, 99, nullptr);
    return 0;
}

int qorv_doppler_ambiguity_shut(int argc, char** argv)
{
    if (argc < 3) {
        fdfTrace("\nSHUT %s", argc > 0 && argv[0] ? argv[0] : "");
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "");
    }
    for (const char* aSuffix : {"_amb1_mli", "_amb2_mli"}) {
        QorvString aName(fqorvJoin(argv[1], aSuffix));
        fdfTrace("\nDELETE %s", aName.get());
        std::remove(aName.get());
    }
    return 1;
}
