// Step 3, autofocus. Stages: set-up (arguments, headers, sizes, geometry), the two looks (filter,
// focus without weights, detection), the look shift, the new velocity into the parameter file.
#include "qorv_autofocus.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_fft.h"
#include "qorv_generic_utility.h"
#include "qorv_geometry_setup.h"
#include "qorv_identifiers.h"
#include "qorv_omegak_kernel.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "qorv_read_write_info.h"
#include "qorv_subaperture_filter.h"
#include "tools_raster_file_exp.h"

namespace {

constexpr double aTwoPi = 2.0 * M_PI;
constexpr int CQORV_AF_LOOKS = 4;
constexpr int CQORV_AF_DECIMATION = 4;
constexpr int CQORV_AF_MAX_WIDTH = 2048;
constexpr int CQORV_AF_INTERPOLATION = 1024;

/// Arguments, header values and sizes of a run.
struct CAutofocusRun {
    std::string mInput, mParFile;
    int psf = 1;
    int ndec = CQORV_AF_DECIMATION;
    int nfir = 8 * CQORV_AF_DECIMATION + 1;
    int nazft = 0;
    int w = 0;            // columns of a look: the centred part of the line
    int mWidth = 0;       // samples of an input line
    int mLines = 0;
    int mOffset = 0;      // first processed input line
    int mColumn0 = 0;     // first column of the centred part
    double fd = 0.0;      // Doppler centroid at the looks' position (Hz)
    CSpaceborneGeometry mGeometry;

    double prf() const { return mGeometry.mIn.mPrf; }
    /// Doppler centroid of look i of four around fd (Hz).
    double lookCentroid(int i) const
    {
        return (mGeometry.mIn.mBandFraction * prf() / (psf * CQORV_AF_LOOKS)) * (i - (CQORV_AF_LOOKS - 1) / 2.0) + fd;
    }
};

std::unique_ptr<CDescriptionHeader> fReadHeader(const std::string& theName, const char* theWords,
                                                std::unique_ptr<CDescriptionHeader> theHeader)
{
    if (!theHeader->read(theName.c_str(), false)) {
        fdfTrace("%s%s\n", theWords, theName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, theName.c_str());
    }
    return theHeader;
}

int fLargestPowerOfTwo(double theLimit)
{
    int p = 1;
    while (2.0 * p <= theLimit) p *= 2;
    return p;
}

/// Step 1: the azimuth FFT size from the processed lines and the product.
int fAzimuthFftSize(const CDescriptionHeader& theInput, const CDescriptionHeader& thePar, const CAutofocusRun& r)
{
    const double L = static_cast<double>(thePar["sar_processing.ProcessedLines"].getInteger()) / (r.psf * r.ndec);
    std::string aOrigin;
    if (!fqorvGetUserKey(theInput, "ORIGIN DATA", aOrigin)) return std::min(4096, fLargestPowerOfTwo(L));
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
    return 4096;  // any other product: the fixed size
}

/// Arguments, headers, sizes and the geometry set-up; false when the header asks to skip.
bool fSetUp(int argc, char** argv, CAutofocusRun& r, std::unique_ptr<CDescriptionHeader>& theInput,
            std::unique_ptr<CDescriptionHeader>& thePar)
{
    r.mInput = argv[1];
    r.mParFile = argv[2];
    theInput = fReadHeader(r.mInput + "_hdr", "Error: missing parameter file ", CDescriptionHeader::makeFull());
    if (fqorvHasValue(*theInput, "Processing.UserSkipAutofocus")) {
        fdfTrace("Skipp autofocus\n");
        return false;
    }
    thePar = fReadHeader(r.mParFile, "Error: missing processing parameter file ",
                         std::make_unique<CDescriptionHeader>(std::initializer_list<const char*>{"sar_processing"}));
    const CDescriptionHeader& in = *theInput;
    const CDescriptionHeader& par = *thePar;
    r.psf = argc > 3 ? std::max(1, std::atoi(argv[3])) : std::max(1, par["sar_processing.AzPresumming"].getInteger());
    r.mWidth = in["RasterInfo.NrOfPixelsPerLine"].getInteger();
    r.mLines = in["RasterInfo.NrOfLinesPerImage"].getInteger();
    r.w = std::min(r.mWidth, CQORV_AF_MAX_WIDTH);
    r.mColumn0 = r.mWidth / 2 - r.w / 2;
    r.nazft = fAzimuthFftSize(in, par, r);
    if (argc > 4 && std::atoi(argv[4]) > 0) r.nazft = std::atoi(argv[4]);
    fdfTrace("# of autofocus subapertures:             %d\n", CQORV_AF_LOOKS);
    fdfTrace("azimuth FFT size:                        %d\n", r.nazft);
    if (r.nazft < 4) {
        fdfTrace("Error: azimuth FFT size %d\n", r.nazft);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "azimuth FFT size");
    }
    if (fqorvHasValue(in, "Processing.LineEstimationVelocity")) {
        r.mOffset = in["Processing.LineEstimationVelocity"].getInteger();
    } else if (fqorvHasValue(in, "Processing.LineEstimationAmbiguity")) {
        r.mOffset = in["Processing.LineEstimationAmbiguity"].getInteger();
    }
    const CGeometryInput aIn = fqorvReadGeometryInput(in, par, CQORV_GEOMETRY_AUTOFOCUS, r.psf, r.ndec, r.mInput + "_hdr");
    YDF_SAR aSar;
    read_image_info(r.mInput.c_str(), aSar);
    double aPixel = 0.0, aLine = 0.0;
    CQORV_GEOMETRY_AUTOFOCUS.dopplerPosition(r.mWidth, r.w, r.mOffset, r.nfir, r.ndec, r.nazft, r.mLines - 1, aPixel, aLine);
    r.fd = aSar.getDopplerFromPixel(aPixel, aLine, false, false);
    r.mGeometry = fqorvSpaceborneGeometry(aIn, r.fd);
    return true;
}

/// One look: filtered around its centroid, focused without weights, rows nazft/4 .. 3 nazft/4 - 1
/// detected into theImage.
void fLook(CRasterFile& theIn, const CAutofocusRun& r, COmegaKBlockFocuser& theFocuser, int i, std::vector<fcomplex>& theImage)
{
    fdfTrace("\nAUTO PROCESSING SUBAPERTURE #%d\n", i);
    const double fdc = r.lookCentroid(i);
    double ws = aTwoPi * fdc / r.prf();
    if (ws < 0.0) ws += aTwoPi;
    const double ws1 = std::fmod(r.psf * ws, aTwoPi);
    const double ws2 = std::fmod(r.psf * r.ndec * ws, aTwoPi);
    fdfTrace("dop. cent.(Hz), ws ws1 ws2 (radians):  %f %f %f %f\n", fdc, ws, ws1, ws2);

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
    theImage.assign(static_cast<std::size_t>(r.nazft / 2) * r.w, fcomplex(0.0f, 0.0f));
    for (int row = r.nazft / 4, o = 0; row < 3 * r.nazft / 4; ++row, ++o)
        for (int n = 0; n < r.w; ++n) theImage[static_cast<std::size_t>(o) * r.w + n] = fcomplex(std::abs(b[row][n]), 0.0f);
}

}  // namespace

double fqorvLookShift(std::vector<fcomplex>& theFirst, std::vector<fcomplex>& theSecond, int theRows, int theColumns)
{
    const FftPlanColumns aForward(theRows, theColumns, FftDirection::Forward);
    const FftPlanColumns aInverse(theRows, theColumns, FftDirection::Inverse);
    aForward.execute(theFirst.data());
    aForward.execute(theSecond.data());
    const float t = 1.0f / static_cast<float>((theRows * 2 * theColumns) / 2);
    const float t2 = t * t;
    for (std::size_t k = 0; k < theFirst.size(); ++k) theFirst[k] = t2 * std::conj(theFirst[k]) * theSecond[k];
    theFirst[0] = fcomplex(0.0f, 0.0f);
    aInverse.execute(theFirst.data());

    fdfTrace("Correlation interpolation\n");
    std::vector<fcomplex> aProfile(static_cast<std::size_t>(theRows));
    for (int r = 0; r < theRows; ++r) {
        float aSum = 0.0f;
        for (int c = 0; c < theColumns; ++c) aSum += std::abs(theFirst[static_cast<std::size_t>(r) * theColumns + c]) / theRows;
        aProfile[static_cast<std::size_t>(r)] = fcomplex(aSum, 0.0f);
    }
    FftPlan1D(theRows, FftDirection::Forward).execute(aProfile.data());
    const int M = theRows * CQORV_AF_INTERPOLATION;
    std::vector<fcomplex> aLong(static_cast<std::size_t>(M), fcomplex(0.0f, 0.0f));
    const float u = 1.0f / static_cast<float>(M);
    for (int k = 0; k <= theRows / 2; ++k) aLong[static_cast<std::size_t>(k)] = aProfile[static_cast<std::size_t>(k)] * u;
    for (int k = theRows / 2 + 1; k < theRows; ++k) aLong[static_cast<std::size_t>(M - theRows + k)] = aProfile[static_cast<std::size_t>(k)] * u;
    FftPlan1D(M, FftDirection::Inverse).execute(aLong.data());
    int aPeak = 0;
    float aMax = 0.0f;
    for (int k = 1; k < M; ++k)
        if (std::abs(aLong[static_cast<std::size_t>(k)]) > aMax) {
            aMax = std::abs(aLong[static_cast<std::size_t>(k)]);
            aPeak = k;
        }
    return aPeak <= M / 2 ? aPeak / static_cast<double>(CQORV_AF_INTERPOLATION)
                          : (aPeak - M) / static_cast<double>(CQORV_AF_INTERPOLATION);
}

double fqorvAutofocusVelocity(double theShift, double theV0, double theSpacing, double theRange, double theWavelength,
                              double theDopplerDifference)
{
    const double t = -theShift * theSpacing / theV0;
    const double K = theRange * theWavelength * theDopplerDifference / 2.0;
    fdfTrace("interpolated correlation shift: pixels, meters, sec: %f %f %f\n", theShift, theShift * theSpacing, t);
    fdfTrace("difference in doppler (Hz):                          %f\n", theDopplerDifference);
    fdfTrace("autofocus scale factor:                              %f\n", K);
    return std::pow(1.0 / (theV0 * theV0) + t / K, -0.5);
}

int qorv_autofocus(int argc, char** argv)
{
    fdfTrace("*** SAR autofocus v4.4 29-oct-99 xq ***\n");
    if (argc < 3) {
        fdfTrace("\nusage: %s <rc_data> <proc_par> [prefilter] [az_FFT] [az_offset] \n\n", argc > 0 ? argv[0] : "");
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    CAutofocusRun r;
    std::unique_ptr<CDescriptionHeader> aInput, aPar;
    if (!fSetUp(argc, argv, r, aInput, aPar)) return 0;

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(*aInput, r.mInput.c_str(), aParam);
    CRasterFile aIn;
    aIn.openRead(aParam);
    COmegaKParam k;
    k.mAzimuthFftSize = r.nazft;
    k.mRangeFftSize = r.w;
    k.mPrf = r.prf();
    k.mSamplingRate = r.mGeometry.mIn.mSamplingRate;
    k.mCarrierFrequency = r.mGeometry.mIn.mCarrierFrequency;
    k.mVelocity = r.mGeometry.mIn.mVelocity;
    k.mNearRange = r.mGeometry.mIn.mNearRange + r.mGeometry.mRangeSpacing * r.mColumn0;
    k.mBandFraction = r.mGeometry.mIn.mBandFraction;
    k.mPresumming = r.psf;
    k.mDecimation = r.ndec;
    const int aThreads = fqorvThreadCount();
    fqorvFftSetThreads(aThreads);
    COmegaKBlockFocuser aFocuser(k, aThreads);
    std::vector<fcomplex> aFirst, aLast;
    int aPercent = 0;
    for (int i = 0; i < CQORV_AF_LOOKS; i += CQORV_AF_LOOKS - 1) {
        fdfProgress(aPercent, 1 + i * 90 / CQORV_AF_LOOKS, 100);
        fLook(aIn, r, aFocuser, i, i == 0 ? aFirst : aLast);
    }
    aIn.close();

    const double aShift = fqorvLookShift(aFirst, aLast, r.nazft / 2, r.w);
    const double v0 = r.mGeometry.mIn.mVelocity;
    const double aSpacing = r.psf * r.ndec * v0 / r.prf();
    const double aNew = fqorvAutofocusVelocity(aShift, v0, aSpacing, r.mGeometry.mIn.mCentreRange, r.mGeometry.mWavelength,
                                               r.lookCentroid(CQORV_AF_LOOKS - 1) - r.lookCentroid(0));
    const double v = (*aPar)["sar_processing.Velocity"].getDouble();
    fdfTrace("initial, new estimated along-track velocity (m/s):   %f %f\n", v0, aNew);
    fdfTrace(" new estimate of the processing velocity: %f\n", aNew / v0 * v);
    (*aPar)["sar_processing.Velocity"].setValue(aNew / v0 * v);
    fdfTrace("writing new processing parameters to parameter file %s\n", r.mParFile.c_str());
    if (!aPar->write(r.mParFile.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", r.mParFile.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, r.mParFile.c_str());
    }
    getAndSetPerc(aPercent, 99, nullptr);
    return 0;
}
