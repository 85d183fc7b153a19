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
#include "qorv_looks.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"

namespace {

constexpr int CQORV_AF_MAX_WIDTH = 2048;
constexpr int CQORV_AF_INTERPOLATION = 1024;

/// Arguments, headers, sizes and the geometry set-up; false when the header asks to skip.
bool fSetUp(int argc, char** argv, CLookRun& r, std::string& theParFile, std::unique_ptr<CDescriptionHeader>& theInput,
            std::unique_ptr<CDescriptionHeader>& thePar)
{
    r.mInput = argv[1];
    theParFile = argv[2];
    theInput = fqorvReadStepHeader(r.mInput + "_hdr", "Error: missing parameter file ", false);
    if (fqorvHasValue(*theInput, "Processing.UserSkipAutofocus")) {
        fdfTrace("Skipp autofocus\n");
        return false;
    }
    thePar = fqorvReadStepHeader(theParFile, "Error: missing processing parameter file ", true);
    const CDescriptionHeader& in = *theInput;
    const CDescriptionHeader& par = *thePar;
    r.psf = argc > 3 ? std::max(1, std::atoi(argv[3])) : std::max(1, par["sar_processing.AzPresumming"].getInteger());
    r.nazft = fqorvLookFftSize(in, par["sar_processing.ProcessedLines"].getInteger(), r.psf, r.ndec, true);
    if (argc > 4 && std::atoi(argv[4]) > 0) r.nazft = std::atoi(argv[4]);
    fdfTrace("# of autofocus subapertures:             %d\n", CQORV_LOOKS);
    fdfTrace("azimuth FFT size:                        %d\n", r.nazft);
    if (fqorvHasValue(in, "Processing.LineEstimationVelocity")) {
        r.mOffset = in["Processing.LineEstimationVelocity"].getInteger();
    } else if (fqorvHasValue(in, "Processing.LineEstimationAmbiguity")) {
        r.mOffset = in["Processing.LineEstimationAmbiguity"].getInteger();
    }
    fqorvLookSetUp(in, par, CQORV_GEOMETRY_AUTOFOCUS, CQORV_AF_MAX_WIDTH, r);
    return true;
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
    CLookRun r;
    std::string aParFile;
    std::unique_ptr<CDescriptionHeader> aInput, aPar;
    if (!fSetUp(argc, argv, r, aParFile, aInput, aPar)) return 0;

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(*aInput, r.mInput.c_str(), aParam);
    CRasterFile aIn;
    aIn.openRead(aParam);
    std::vector<fcomplex> aFirst, aLast;
    fqorvFocusLooks(aIn, r, "AUTO PROCESSING SUBAPERTURE #", aFirst, aLast);
    aIn.close();

    const double aShift = fqorvLookShift(aFirst, aLast, r.nazft / 2, r.w);
    const double v0 = r.mGeometry.mIn.mVelocity;
    const double aSpacing = r.psf * r.ndec * v0 / r.prf();
    const double aNew = fqorvAutofocusVelocity(aShift, v0, aSpacing, r.mGeometry.mIn.mCentreRange, r.mGeometry.mWavelength,
                                               r.lookCentroid(CQORV_LOOKS - 1) - r.lookCentroid(0));
    const double v = (*aPar)["sar_processing.Velocity"].getDouble();
    fdfTrace("initial, new estimated along-track velocity (m/s):   %f %f\n", v0, aNew);
    fdfTrace(" new estimate of the processing velocity: %f\n", aNew / v0 * v);
    (*aPar)["sar_processing.Velocity"].setValue(aNew / v0 * v);
    fdfTrace("writing new processing parameters to parameter file %s\n", aParFile.c_str());
    if (!aPar->write(aParFile.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aParFile.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aParFile.c_str());
    }
    getAndSetPerc(-1, 99, nullptr);
    return 0;
}
