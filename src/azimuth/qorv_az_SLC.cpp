// Step 5 "SAR azimuth omega/k processor".
//
// The front end reads the headers once into CAzSlcParam, sizes the transforms, runs the geometry
// set-up, writes the SLC under "<SLC>_tmp" block by block through COmegaKBlockFocuser, writes its
// header, normalises it and only then renames it to "<SLC>": a run that stops half-way leaves no
// file under the product's name.
#include "qorv_az_SLC.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "qorv_column_velocity.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_geometry_setup.h"
#include "qorv_identifiers.h"
#include "qorv_multi_SLC.h"
#include "qorv_multilook_services.h"
#include "qorv_omegak_kernel.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "qorv_read_write_info.h"
#include "qorv_subaperture_filter.h"
#include "tools_raster_file_exp.h"
#include "qorv_raster_utility.h"

namespace {

constexpr double CSAR_C = 299792458.0;
constexpr int CQORV_AZ_ARGUMENT_NBR = 9;
constexpr int CQORV_FIXED_AZ_FFT = 16384;
constexpr unsigned CQORV_MAX_BLOCK_SAMPLES = 134217728u;
constexpr int CQORV_GUARD_MARGIN = 10;  // lines added to the guards of the second pass
constexpr double CQORV_NORMALIZE_POWER = 16000.0;
constexpr double CQORV_NULL_LIMIT = 1.1754943508222875e-38;
constexpr const char* CQORV_AZIMUTH_SETTING = "QORVEX_AZIMUTH";

/// Arguments, header values and the sizes of the run.
struct CAzSlcParam {
    std::string mInput, mOutput, mParFile, mWriteName;
    int psf = 1;
    int ndec = 1;              // also the subaperture count nsub
    int nazft = 0;
    int nrfft = 0;
    int mLineOffset = 0;       // aAzimuthLineOffsetForProcessing
    int az_line = 0;
    int mWidth = 0;            // NrOfPixelsPerLine of the input
    int mLines = 0;            // lines of the input image
    bool mHalfPixelShift = false;
    double mCentroid0 = 0.0;   // fd0, Doppler centroid at pixel 0, line 0
    double mShift = 0.0;       // s, lines
    int aMmdsk1 = 0;
    CSpaceborneGeometry mGeometry;
    std::optional<CColumnVelocityModel> mColumnVelocity;  // set in the precise mode only

    int nsub() const { return ndec; }
    bool precise() const { return mColumnVelocity.has_value(); }
    double prf() const { return mGeometry.mIn.mPrf; }
    double bandFraction() const { return mGeometry.mIn.mBandFraction; }
    int lastLine() const { return mLines - 1; }
    /// bw: the processed band of one subaperture (Hz).
    double bandwidth() const { return nsub() == 1 ? bandFraction() * prf() / (psf * ndec) : prf() / (psf * ndec); }
    /// Doppler centroid of subaperture i around the centroid fd (Hz).
    double subapertureCentroid(int i, double fd) const
    {
        return (bandFraction() * prf() / (psf * nsub())) * (i - (nsub() - 1) / 2.0) + fd;
    }
};

bool fIsNull(float x) { return !std::isnan(x) && std::fabs(x) <= CQORV_NULL_LIMIT; }

void fProgress(int& thePercent, int theNewPercent)
{
    if (theNewPercent == thePercent || theNewPercent >= 100) return;
    if (!getAndSetPerc(thePercent, theNewPercent, nullptr)) {
        fdfTrace("\n EXECUTION INTERRUPTED BY OPERATOR\n");
        QORV_FATAL(CQORV_ERR_OPERATOR_STOP, "");
    }
    thePercent = theNewPercent;
}

/// Step 1: the transform sizes.
void fFftSizes(const CDescriptionHeader& theInput, const CDescriptionHeader& thePar, int argc, char** argv,
               CAzSlcParam& p)
{
    p.nrfft = thePar["sar_processing.RgFFT"].getInteger();
    if (argc > 9 && std::atoi(argv[9]) >= 16) p.nrfft = std::atoi(argv[9]);
    int aFixedFft = argc > 10 && std::atoi(argv[10]) >= 1024 ? std::atoi(argv[10]) : CQORV_FIXED_AZ_FFT;

    std::string aOrigin;
    const int aProduct = fqorvGetUserKey(theInput, "ORIGIN DATA", aOrigin) ? fqorvOrigProdStrToID(aOrigin.c_str()) : 0;
    static const int aFixedProducts[] = {22, 37, 38, 39, 105, 106, 107};
    const bool aFixed = std::find(std::begin(aFixedProducts), std::end(aFixedProducts), aProduct) != std::end(aFixedProducts);
    if (aFixed) aFixedFft = CQORV_FIXED_AZ_FFT;
    aFixedFft = (aFixedFft + 1023) / 1024 * 1024;
    p.nazft = std::atoi(argv[6]);
    if (aFixed) {
        p.nazft = aFixedFft;
        while (static_cast<unsigned>(p.nazft) * static_cast<unsigned>(p.nrfft) > CQORV_MAX_BLOCK_SAMPLES) p.nazft -= 1024;
    }
    if (aProduct == 24 && fqorvHasValue(theInput, "ChannelInfo.Description")) {
        const char* aPol = theInput["ChannelInfo.Description"].getString(0);
        p.mHalfPixelShift = std::strcmp(aPol, "VH") == 0 || std::strcmp(aPol, "VV") == 0;
    }
    std::printf("\nAZIMUTH FFT SIZE %d\n", p.nazft);
    std::printf("RANGE FFT SIZE %d\n", p.nrfft);
    if (p.nazft < 2 || p.nrfft < 2) {
        fdfTrace("Error: FFT sizes %d x %d\n", p.nazft, p.nrfft);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "FFT size");
    }
}

/// The azimuth mode of the run: "QORVEX_AZIMUTH" precise or block (block when unset). The precise
/// mode needs the orbit for its column velocities; without it the block mode focuses, with a warning.
void fChooseMode(const CDescriptionHeader& theInput, CAzSlcParam& p)
{
    const char* aSetting = std::getenv(CQORV_AZIMUTH_SETTING);
    const std::string aMode = aSetting ? aSetting : "";
    if (aMode.empty() || aMode == "block") return;
    if (aMode != "precise") {
        fdfTrace("Error: %s=%s: the azimuth mode is precise or block\n", CQORV_AZIMUTH_SETTING, aMode.c_str());
        QORV_FATAL(CQORV_ERR_SETTING_VALUE, (std::string(CQORV_AZIMUTH_SETTING) + "=" + aMode + ": precise or block").c_str());
    }
    std::string aReason;
    p.mColumnVelocity = CColumnVelocityModel::fromHeader(theInput, p.mGeometry.mIn.mVelocity, aReason);
    if (p.mColumnVelocity) {
        const double r0 = p.mGeometry.mIn.mNearRange, dr = p.mGeometry.mRangeSpacing;
        for (const int aLine : {0, p.lastLine()})
            if (p.mColumnVelocity->velocities(r0, dr, p.nrfft, aLine).empty()) {
                aReason = "the orbit reaches no target at some range of the swath";
                p.mColumnVelocity.reset();
            }
    }
    if (!p.mColumnVelocity) {
        fdfTrace("Warning: precise azimuth mode not possible (%s): block mode\n", aReason.c_str());
        QORV_WARNING(CQORV_WARN_PRECISE_FALLBACK, ("block mode: " + aReason).c_str());
        return;
    }
    fdfTrace("Azimuth mode: precise (effective velocity per range column)\n");
}

/// Arguments, headers, sizes and the geometry set-up.
void fSetUp(int argc, char** argv, YDF_SAR& theSar, std::unique_ptr<CDescriptionHeader>& theInput,
            std::unique_ptr<CDescriptionHeader>& thePar, CAzSlcParam& p)
{
    p.mInput = argv[1];
    p.mOutput = argv[2];
    p.mParFile = argv[3];
    p.mWriteName = p.mOutput + "_tmp";
    fdfTrace("prefiltered/range compressed data file: %s\n", p.mInput.c_str());
    fdfTrace("output SLC SAR image file:              %s\n", p.mOutput.c_str());
    fdfTrace("processing parameter file:              %s\n", p.mParFile.c_str());
    read_image_info(p.mInput.c_str(), theSar);
    p.mLines = theSar.nrow;

    theInput = fqorvReadStepHeader(p.mInput + "_hdr", "Error: missing parameter file ", false);
    thePar = fqorvReadStepHeader(p.mParFile, "Error: missing processing parameter file ", true);
    CDescriptionHeader& aPar = *thePar;
    p.psf = std::max(std::atoi(argv[4]), 1);
    p.ndec = std::max(std::atoi(argv[5]), 1);
    aPar["sar_processing.AzPresumming"].setValue(p.psf);
    aPar["sar_processing.AzSubaperture"].setValue(p.ndec);
    fdfTrace("initial prefilter decimation factor:     %d\n", p.psf);
    fdfTrace("# of subapertures:                       %d\n", p.ndec);
    fdfTrace("decimation factor:                       %d\n", p.ndec);
    p.mLineOffset = std::atoi(argv[7]);
    p.az_line = std::atoi(argv[8]);
    if (p.az_line == 0) p.az_line = aPar["sar_processing.ProcessedLines"].getInteger();
    fdfTrace("offset #lines to first processed record: %d\n", p.mLineOffset);
    fdfTrace("# of processed records:                  %d\n", p.az_line);
    p.mWidth = (*theInput)["RasterInfo.NrOfPixelsPerLine"].getInteger();
    fdfTrace("range compressed SLC width (samples):    %d\n", p.mWidth);
    if (p.az_line < 1 || p.mLines < 1) {
        fdfTrace("Error: # of processed records %d, image lines %d\n", p.az_line, p.mLines);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "ProcessedLines");
    }
    fFftSizes(*theInput, aPar, argc, argv, p);

    const CGeometryInput aIn = fqorvReadGeometryInput(*theInput, aPar, CQORV_GEOMETRY_OMEGAK, p.psf, p.ndec,
                                                      p.mInput + "_hdr");
    p.mCentroid0 = theSar.getDopplerFromPixel(0.0, 0.0, false, false);
    fdfTrace("TBD NEW_DOPPLER_APPROCH  fd : %f\n", p.mCentroid0);
    p.mGeometry = fqorvSpaceborneGeometry(aIn, p.mCentroid0);
    fChooseMode(*theInput, p);
}

/// Step 3: the output header, and the output raster created from it under the temporary name.
std::unique_ptr<CDescriptionHeader> fOutputHeader(const CDescriptionHeader& theInput, const CDescriptionHeader& thePar,
                                                  const CAzSlcParam& p, CRasterFile& theOut)
{
    std::unique_ptr<CDescriptionHeader> aOut = CDescriptionHeader::makeFull();
    aOut->copyFrom(theInput, false);
    fqorvWriteGeometryFields(p.mGeometry, theInput, *aOut);
    CDescriptionHeader& o = *aOut;
    o["RasterInfo.NrOfPixelsPerLine"].setValue(p.mWidth);
    o["RasterInfo.NrOfLinesPerImage"].setValue(p.az_line);
    o["RasterInfo.NrOfChannels"].setValue(p.nsub());
    o["RasterInfo.DataUnits"].setValue("SLC");
    o["Processing.NAzimuthLooks"].setValue(thePar["sar_processing.AzPresumming"].getInteger() *
                                           thePar["sar_processing.AzSubaperture"].getInteger());
    const char* aAngleKey = fqorvHasValue(theInput, "ChannelInfo.IncidenceAngle") ? "ChannelInfo.IncidenceAngle"
                                                                           : "ChannelInfo.RangeLookAngle";
    if (fqorvHasValue(theInput, aAngleKey)) {
        int aRangeLooks = 0, aAzimuthLooks = 0;
        double aRangeGround = 0.0, aAzimuthGround = 0.0;
        if (fqorvSuggestedLooks(p.mGeometry.mRangeSpacing, p.mGeometry.azimuthSpacing(), theInput[aAngleKey].getDouble(),
                                90.0, aRangeLooks, aAzimuthLooks, aRangeGround, aAzimuthGround)) {
            o["Processing.SuggestedAzimuthLooks"].setValue(aAzimuthLooks);
            o["Processing.SuggestedRangeLooks"].setValue(aRangeLooks);
            o["Processing.AzimuthGroundPixelSpaceFromSuggestLooks"].setValue(aAzimuthGround);
            o["Processing.RangeGroundPixelSpaceFromSuggestLooks"].setValue(aRangeGround);
        }
    }
    // The setting is stored first and then overwritten: the SLC is always written big-endian.
    o["RasterInfo.BytesOrder"].setValue(fdfGetSetting(CQORV_DEFAULT_BYTE_ORDER));
    o["RasterInfo.BytesOrder"].setValue("MSBF");
    o["RasterInfo.CellType"].setValue("FLOAT_COMPLEX");
    for (const char* aKey : {"RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix"}) o[aKey].setValue(0);
    char aText[64];
    std::snprintf(aText, sizeof aText, "%lf", p.mCentroid0);
    fqorvSetUserKey(o, "DOPPLER VALUE(0   0)", aText);
    fqorvSetUserKey(o, "AZIMUTH FOCUSING", p.precise() ? "precise" : "block");

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(o, p.mWriteName.c_str(), aParam);
    aParam.mNrOfLinesPerImage = p.az_line * p.nsub();  // subapertures one after the other
    theOut.openWrite(CQORV_RF_OPEN_WRITE, aParam);
    return aOut;
}

/// Step 4: the whole-line shift s that centres data whose Doppler centroid lies beyond half the PRF.
double fCentringShift(YDF_SAR& theSar, const CAzSlcParam& p)
{
    const double fd0 = p.mCentroid0;
    const double aPrf = p.prf();
    const double aHalf = p.nsub() == 1 ? p.bandFraction() * aPrf / (2.0 * p.psf) : aPrf / (2.0 * p.psf);
    const int aLine = std::min(p.mLineOffset + p.nazft / 2, p.lastLine());
    const double fd1 = theSar.getDopplerFromPixel(p.mWidth - 1, aLine, false, false);
    fdfTrace("TBD NEW_DOPPLER_APPROCH 2 ff : %f\n", fd1);
    double s = 0.0;
    const CSpaceborneGeometry& g = p.mGeometry;
    const double aLinesPerHz = aPrf / (p.psf * p.ndec);
    auto aShift = [&](double theP) {
        const double u = std::trunc(((fd0 + theP) / g.fmRate(g.mIn.mNearRange)) * aLinesPerHz);
        const double w = std::trunc(((fd1 + theP) / g.fmRate(g.mIn.mFarRange)) * aLinesPerHz);
        return std::fabs(w) > std::fabs(u) ? u : w;
    };
    if (fd0 > aPrf / 2.0) s = aShift(-aHalf);
    else if (fd0 < -aPrf / 2.0) s = aShift(aHalf);
    fdfTrace("Amount of shift to center the data [pix]: %f\n", s);
    return s;
}

/// Step 5: guards m1, m2 (lines) of subaperture i at slant range theRange for the centroid fd.
void fGuards(const CAzSlcParam& p, double theRange, double fd, int i, int& m1, int& m2)
{
    const double bw = p.bandwidth();
    const double fsub = p.subapertureCentroid(i, fd);
    const double ka = p.mGeometry.fmRate(theRange);
    const double a = std::fabs((fsub + bw / 2.0) / ka);
    const double b = std::fabs((fsub - bw / 2.0) / ka);
    const double aLinesPerS = p.prf() / (p.psf * p.ndec);
    m1 = p.mShift > 0.0 ? 0 : static_cast<int>(a * aLinesPerS + p.mShift);
    m2 = p.mShift < 0.0 ? 0 : static_cast<int>(b * aLinesPerS - p.mShift);
}

/// Guards at range sample n, line L: the slant range in metres is what the Doppler evaluation gets
/// as its pixel argument here.
void fGuardsAt(YDF_SAR& theSar, const CAzSlcParam& p, int n, int L, int i, int& m1, int& m2)
{
    const double r = p.mGeometry.slantRange(n);
    const double fd = theSar.getDopplerFromPixel(std::trunc(r), L, false, false);
    fGuards(p, r, fd, i, m1, m2);
}

/// Step 5, both passes: the block overlap aMmdsk1.
void fBlockGuards(YDF_SAR& theSar, CAzSlcParam& p, int& thePercent)
{
    const int aLine = std::min(p.mLineOffset + p.nazft / 2, p.lastLine());
    int mdsk1 = 0, mdsk2 = 0, i = 0;
    for (i = 0; i < p.nsub(); i += std::max(p.nsub() - 1, 1))
        for (int n = 0; n < p.nrfft; n += std::max(p.nrfft - 1, 1)) {
            int m1 = 0, m2 = 0;
            fGuardsAt(theSar, p, n, aLine, i, m1, m2);
            mdsk1 = std::max(mdsk1, m1);
            mdsk2 = std::max(mdsk2, m2);
        }
    int aIncrement = p.nazft - mdsk1 - mdsk2;
    fdfTrace("Number of lines in every processed block: %d\n", p.nazft);
    fdfTrace("Line increment between processed blocks: %d\n", aIncrement);
    fdfTrace("mdsk1: %d\n", mdsk1);
    fdfTrace("mdsk2: %d\n", mdsk2);

    fProgress(thePercent, 1);
    // Second pass over the whole image with the last range sample and the subaperture index the
    // first pass left behind; the pixel positions run up to the image's line count.
    const double r = p.mGeometry.slantRange(p.nrfft - 1);
    bool aFirst = true;
    for (int L = 0; L < p.mLines; ++L)
        for (int aPixel = 0; aPixel <= p.mLines; aPixel += 1000) {
            const double fd = theSar.getDopplerFromPixel(aPixel, L, false, false);
            int m1 = 0, m2 = 0;
            fGuards(p, r, fd, i, m1, m2);
            mdsk1 = aFirst ? m1 : std::max(mdsk1, m1);
            mdsk2 = aFirst ? m2 : std::max(mdsk2, m2);
            aFirst = false;
            if (p.nazft - mdsk1 - mdsk2 - CQORV_GUARD_MARGIN < aIncrement) {
                aIncrement = p.nazft - mdsk1 - mdsk2 - CQORV_GUARD_MARGIN;
                fdfTrace("New Line increment between processed blocks: %d\n", aIncrement);
            }
        }
    fdfTrace("TBD NEW_DOPPLER_APPROCH 3 ff : %d %d\n", mdsk1, mdsk2);
    p.aMmdsk1 = mdsk1 + CQORV_GUARD_MARGIN;
    fdfTrace("COMPUTED BLOCK Line increment between processed blocks: %d\n", aIncrement);
}

/// Reads input line theLine into theRow (the first nrfft samples; the rest of a wider line is left out).
void fReadRow(CRasterFile& theIn, const CAzSlcParam& p, int theLine, std::vector<fcomplex>& theLineBuffer, fcomplex* theRow)
{
    fqorvReadLine(theIn, theLineBuffer.data(), theLine);
    const int aCount = std::min(p.mWidth, p.nrfft);
    std::copy(theLineBuffer.begin(), theLineBuffer.begin() + aCount, theRow);
    std::fill(theRow + aCount, theRow + p.nrfft, fcomplex(0.0f, 0.0f));
}

/// The coefficient listing "subaper.dat" of the subaperture road.
class CSubaperListing {
public:
    explicit CSubaperListing(const CAzSlcParam& p)
    {
        const std::string aName = p.mOutput + "subaper.dat";
        mFile = std::fopen(aName.c_str(), "w");
        if (mFile == nullptr) {
            fdfTrace("cannot open subaperture filter coefficient data file: subaper.dat\n");
            QORV_FATAL(CQORV_ERR_CREATE_FILE, aName.c_str());
        }
        std::fprintf(mFile, "%4d %4d\n", p.nsub(), 8 * p.ndec + 1);
        fdfTrace("subaperture filter circular buffer size (bytes): %zu\n",
                 static_cast<std::size_t>(8 * p.ndec + 1) * p.nrfft * sizeof(fcomplex));
    }
    ~CSubaperListing() { close(); }
    void close()
    {
        if (mFile) std::fclose(mFile);
        mFile = nullptr;
    }
    std::FILE* file() const { return mFile; }

private:
    std::FILE* mFile = nullptr;
};

/// State that survives from block to block.
struct CBlockState {
    int block = 0;
    std::vector<int> mLastWritten;      // per subaperture, output line index
    std::vector<fcomplex> mLastGood;    // last non-empty input line
    std::vector<fcomplex> mLine;        // current input line
    std::vector<fcomplex> mOutLine;
    long long aDummyValNbr = 0, aNoDummyValNbr = 0;
    double mReadSeconds = 0.0, mFocusSeconds = 0.0, mGuardSeconds = 0.0, mWriteSeconds = 0.0;  // traced at the end
};

/// Seconds since theStart, and theStart moved to now.
double fLap(std::chrono::steady_clock::time_point& theStart)
{
    const auto aNow = std::chrono::steady_clock::now();
    const double s = std::chrono::duration<double>(aNow - theStart).count();
    theStart = aNow;
    return s;
}

/// Step 13: writes the block's valid rows of subaperture i under the mask of the input lines.
void fWriteRows(CRasterFile& theIn, CRasterFile& theOut, const CAzSlcParam& p, COmegaKBlockFocuser& theFocuser, int i,
                int theMdsk2, CBlockState& st)
{
    const int aBase = i * p.az_line;
    int aFrom, aTo, aRowOfLine;
    if (st.block == 0) {
        aFrom = aBase;
        aTo = aBase + p.nazft - theMdsk2;
        aRowOfLine = -aBase;
        fdfTrace("Wrote Block 0   \n");
    } else {
        aFrom = st.mLastWritten[i];
        aTo = p.nazft + aBase + st.block - theMdsk2;
        aRowOfLine = -aBase - st.block;
        fdfTrace("Changes block: %d\nSTART BLOCK : %d\nEND BLOCK : %d\n", st.block, aFrom, aTo);
    }
    aFrom = std::max(aFrom, aBase);
    aTo = std::min(aTo, aBase + p.az_line);
    for (int l = aFrom; l < aTo; ++l) {
        const int aRow = l + aRowOfLine;
        if (aRow < 0 || aRow >= p.nazft) continue;
        const int aInputLine = p.mLineOffset + l - aBase;
        bool aEmpty = true;
        if (aInputLine >= 0 && aInputLine < p.mLines) {
            fqorvReadLine(theIn, st.mLine.data(), aInputLine);
            for (int n = 0; n < p.mWidth && aEmpty; ++n)
                aEmpty = fIsNull(st.mLine[n].real()) && fIsNull(st.mLine[n].imag());
        }
        if (aEmpty) st.mLine = st.mLastGood;
        else st.mLastGood = st.mLine;
        const fcomplex* aData = theFocuser.block()[aRow];
        for (int n = 0; n < p.mWidth; ++n) {
            const bool aMasked = fIsNull(st.mLine[n].real()) && fIsNull(st.mLine[n].imag());
            st.mOutLine[n] = aMasked || n >= p.nrfft ? fcomplex(0.0f, 0.0f) : aData[n];
            if (fIsNull(st.mOutLine[n].real()) && fIsNull(st.mOutLine[n].imag())) ++st.aDummyValNbr;
            else ++st.aNoDummyValNbr;
        }
        fqorvWriteLine(theOut, st.mOutLine.data(), l);
        st.mLastWritten[i] = l;
    }
}

/// Steps 7 to 13 for subaperture i of the block at input line theOffset.
void fProcessSubaperture(YDF_SAR& theSar, CRasterFile& theIn, CRasterFile& theOut, CAzSlcParam& p,
                         COmegaKBlockFocuser& theFocuser, CSubapertureFilter* theFilter, int i, int theOffset,
                         double fd, CBlockState& st)
{
    auto aClock = std::chrono::steady_clock::now();
    double fdc = p.subapertureCentroid(i, fd);
    double ws = 0.0, ws1 = 0.0, ws2 = 0.0;
    fqorvSubapertureAngles(p.mGeometry, fdc, ws, ws1, ws2);
    const int aRefPoints = p.mGeometry.apertureLines(p.bandwidth(), p.mGeometry.fmRateSquinted(fdc));
    fdfTrace("az. ref. nom. #points (m, az. pixels): %f %d\n", aRefPoints * p.mGeometry.mSpacingNoOrbit, aRefPoints);

    CQorvMatrix<fcomplex>& aBlock = theFocuser.block();
    if (theFilter == nullptr) {
        fdfTrace("\nno subaperture filtering, reading prefiltered data (lines): %d\n", p.nazft);
        std::fill(aBlock.data(), aBlock.data() + aBlock.nRows() * aBlock.nCols(), fcomplex(0.0f, 0.0f));
        const int aCount = std::min(p.nazft, p.mLines - theOffset);
        for (int k = 0; k < aCount; ++k)
            if (theOffset + k >= 0) fReadRow(theIn, p, theOffset + k, st.mLine, aBlock[k]);
        if (aCount < p.nazft) fdfTrace("Warning: insufficient #prefilter lines for az. FFT size: %d\n", aCount);
        if (p.mWidth > p.nrfft) fdfTrace("Warning: insufficient lines for rg. FFT size: %d\n", p.mWidth);
    } else {
        const QorvLineReader aRead = [&](int theLine, fcomplex* theRow) { fReadRow(theIn, p, theLine, st.mLine, theRow); };
        theFilter->fill(aRead, p.mLines, theOffset, p.mGeometry.mFilterBandwidthRad, ws1, aBlock);
    }

    st.mReadSeconds += fLap(aClock);

    // Step 9: the Doppler bin keeps the centroid above; the tables take the one at the final block
    // centre. The precise mode takes both from the final centre.
    int ndc = fqorvDopplerBin(ws2, p.nazft);
    const int aCentreLine = std::min(theOffset + p.nazft / 2, p.lastLine());
    const double fdNew = theSar.getDopplerFromPixel(p.nrfft / 2, aCentreLine, false, false);
    fdfTrace("TBD NEW_DOPPLER_APPROCH 4 fd : %f\n", fdNew);
    p.mGeometry = fqorvSpaceborneGeometry(p.mGeometry.mIn, fdNew);
    fdc = p.subapertureCentroid(i, fdNew);
    if (p.precise()) {
        fqorvSubapertureAngles(p.mGeometry, fdc, ws, ws1, ws2);
        ndc = fqorvDopplerBin(ws2, p.nazft);
        const std::vector<double> aVelocities = p.mColumnVelocity->velocities(
            theFocuser.param().mNearRange, p.mGeometry.mRangeSpacing, p.nrfft, aCentreLine);
        if (!aVelocities.empty()) theFocuser.setColumnVelocities(aVelocities);
        else fdfTrace("Warning: no column velocities at line %d: the previous block's are kept\n", aCentreLine);
    }
    theFocuser.setDoppler(fdc, ndc, p.mShift);
    theFocuser.focus();
    st.mFocusSeconds += fLap(aClock);

    // Step 12: guards of every range sample at the block centre.
    int mdsk1 = 0, mdsk2 = 0;
    for (int n = 0; n < p.nrfft; ++n) {
        int m1 = 0, m2 = 0;
        fGuardsAt(theSar, p, n, aCentreLine, i, m1, m2);
        theFocuser.clearGuards(n, m1, m2);
        mdsk1 = std::max(mdsk1, m1);
        mdsk2 = std::max(mdsk2, m2);
    }
    st.mGuardSeconds += fLap(aClock);
    fWriteRows(theIn, theOut, p, theFocuser, i, mdsk2, st);
    st.mWriteSeconds += fLap(aClock);
}

/// Step 6: the block loop.
void fProcessBlocks(YDF_SAR& theSar, CRasterFile& theIn, CRasterFile& theOut, CAzSlcParam& p, int& thePercent,
                    CBlockState& st)
{
    COmegaKParam aKernel = fqorvBlockParam(p.mGeometry, p.nazft, p.nrfft, 0);
    aKernel.mHalfPixelShift = p.mHalfPixelShift;
    aKernel.mPrecise = p.precise();
    const int aThreads = fqorvThreadCount();
    fqorvFftSetThreads(aThreads);
    COmegaKBlockFocuser aFocuser(aKernel, aThreads);
    fdfTrace("SAR data buffer size (bytes): %zu\n", static_cast<std::size_t>(p.nazft) * p.nrfft * sizeof(fcomplex));
    std::unique_ptr<CSubaperListing> aListing;
    std::unique_ptr<CSubapertureFilter> aFilter;
    if (p.nsub() > 1) {
        aListing = std::make_unique<CSubaperListing>(p);
        aFilter = std::make_unique<CSubapertureFilter>(p.ndec, p.nrfft, aListing->file());
    }

    const long long aTotal = static_cast<long long>(p.az_line) * p.ndec;
    for (int i = 0; i < p.nsub(); ++i) st.mLastWritten[i] = i * p.az_line;
    while (st.block < aTotal) {
        fProgress(thePercent, static_cast<int>(static_cast<double>(st.block) / aTotal * 98.0) + 1);
        int aOffset = p.mLineOffset + st.block;
        const double fd = theSar.getDopplerFromPixel(p.nrfft / 2, std::min(aOffset + p.nazft / 2, p.lastLine()), false, false);
        fdfTrace("]TBD Doppler Value : %f\n", fd);
        const bool aLast = st.block + static_cast<long long>(p.nazft) * p.ndec >= aTotal;
        if (aLast) {
            const int back = static_cast<int>(st.block + static_cast<long long>(p.nazft) * p.ndec - aTotal);
            st.block -= back;
            aOffset -= back;
            fdfTrace("  back = %d\n", back);
        }
        fdfTrace("\nProcessing lines [%d]-[%d]\n", aOffset, aOffset + p.nazft * p.ndec - 1);
        for (int i = 0; i < p.nsub(); ++i)
            fProcessSubaperture(theSar, theIn, theOut, p, aFocuser, aFilter.get(), i, aOffset, fd, st);
        if (aLast) break;
        const int aNext = st.mLastWritten[0] - p.aMmdsk1 / p.ndec;
        if (aNext <= st.block) {
            fdfTrace("Error: azimuth FFT size %d too small for the aperture (block %d)\n", p.nazft, st.block);
            QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "azimuth FFT size too small for the aperture");
        }
        st.block = aNext;
    }
    if (aListing) aListing->close();
}

/// Step 14: header, normalisation, final name.
void fFinish(CRasterFile& theIn, CRasterFile& theOut, CDescriptionHeader& theOutput, const CAzSlcParam& p,
             const CBlockState& st)
{
    theOut.close();
    const std::string aHeaderName = p.mWriteName + "_hdr";
    fdfTrace("writing new parameters to parameter file %s\n", aHeaderName.c_str());
    if (!theOutput.write(aHeaderName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aHeaderName.c_str());
    }
    theIn.close();
    auto aClock = std::chrono::steady_clock::now();
    fqorvNormalizeRaster(p.mWriteName.c_str(), aHeaderName.c_str(), CQORV_NORMALIZE_POWER, 0.0, false, nullptr, 0.3333);
    fdfTrace("Seconds: reading and filtering %.2f, focusing %.2f, guards %.2f, masking and writing %.2f, normalisation %.2f\n",
             st.mReadSeconds, st.mFocusSeconds, st.mGuardSeconds, st.mWriteSeconds, fLap(aClock));
    theOutput.reset();
    theOutput.read(aHeaderName.c_str(), false);
    fqorvRenameProduct(p.mWriteName.c_str(), p.mOutput.c_str());
    fdfTrace("aNoDummyValNbr =  %lld\n", st.aNoDummyValNbr);
    fdfTrace("aDummyValNbr =  %lld\n", st.aDummyValNbr);
}

}  // namespace

int qorv_az_SLC(int argc, char** argv)
{
    fdfTrace("*** SAR azimuth omega/k processor COMPLEX v2.4 29-oct-99 xq ***\n");
    if (argc < CQORV_AZ_ARGUMENT_NBR) {
        fdfTrace("\nusage: %s <rc_data> <SLC> <proc_par> <psf> <nsub> <nazft> <offset> <#lines> [nrfft] [nazft_fixed]\n",
                 argc > 0 && argv[0] ? argv[0] : "");
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    YDF_SAR aSar;
    std::unique_ptr<CDescriptionHeader> aInput, aPar;
    CAzSlcParam p;
    fSetUp(argc, argv, aSar, aInput, aPar, p);

    CRasterFile aOut;
    std::unique_ptr<CDescriptionHeader> aOutput = fOutputHeader(*aInput, *aPar, p, aOut);
    p.mShift = fCentringShift(aSar, p);
    int aPercent = 0;
    fBlockGuards(aSar, p, aPercent);

    CRasterFileParam aInParam;
    fqorvRasterParamFromHeader(*aInput, p.mInput.c_str(), aInParam);
    CRasterFile aIn;
    aIn.openRead(aInParam);
    CBlockState st;
    st.mLastWritten.assign(p.nsub(), 0);
    st.mLastGood.assign(p.mWidth, fcomplex(0.0f, 0.0f));
    st.mLine.assign(std::max(p.mWidth, p.nrfft), fcomplex(0.0f, 0.0f));
    st.mOutLine.assign(p.mWidth, fcomplex(0.0f, 0.0f));
    fProcessBlocks(aSar, aIn, aOut, p, aPercent, st);
    fFinish(aIn, aOut, *aOutput, p, st);
    return 0;
}

int qorv_az_SLC_shut(int argc, char** argv)
{
    if (argc < 2) QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    fdfTrace("\nSHUT %s\n", argv[1]);
    std::remove(argv[1]);
    return 1;
}
