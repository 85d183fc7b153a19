// Step 2, range compression. Stages: set-up (arguments, headers, channel, matched filter), the
// output header, the I/Q offsets, then the direct line loop (no presumming) or the prefilter loop
// over a circular buffer of rows, and the end (close, final names, report).
#include "qorv_pre_rc.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "qorv_chirp.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_identifiers.h"
#include "qorv_line_continuity.h"
#include "qorv_orbit_utility.h"
#include "qorv_product_files.h"
#include "qorv_progress.h"
#include "qorv_range_compressor.h"
#include "qorv_raster_file.h"
#include "tools_raster_file_exp.h"

namespace {

constexpr double CSAR_C = 299792458.0;
constexpr int CQORV_LINES_NBR_DC_BIAS_EST = 2048;
constexpr int CQORV_TRACE_EVERY = 2048;

/// Arguments, header values and the derived sizes of a run.
struct CRangeCompressionRun {
    std::string mInput, mOutput, mParFile, mWriteName;
    int D = 1;                 // prefilter decimation factor
    int mFirstLine = 0;        // offset #echoes of the first line
    int nl = 0;                // lines to compress
    int N = 0;                 // range FFT size
    int F = 0;                 // first pixel
    int mLineLength = 0;       // aNrOfPixelsPerLine of the raw data
    int mRasterLines = 0;      // records of the raw raster (all channels)
    int mChannel = 0;          // index of the processed channel
    int mChannelBase = 0;      // first record of the channel
    int mSwstNullValue = 0;    // "Processing.SWST_null_value_used"
    int aWidth = 0;
    int aLastColumn = 0;
    int aChirpUsed = 0;
    int aRangeOut = 0;
    int mPrefixBytes = 0;
    double mPixelSpacing = 0.0;
    CRangeChirpParam mChirp;
    CContinuityLayout mLayout;
    std::string mChirpText, mSpectrumText;
    double mCentroid = 0.0;    // Doppler centroid (Hz), the prefilter's band centre
    double mBandFraction = 0.8;
    double mPrf = 0.0;

    int taps() const { return D == 1 ? 1 : 8 * D + 1; }
    int circularRows() const { return D == 1 ? 1 : 2 * taps(); }
};

void fUsage(const char* theProgram)
{
    fdfTrace("\nusage: %s <signal_data> <rc_data> <proc_par> [prefilter] [offset] [nl] [aRgFFTSize]\n",
             theProgram ? theProgram : "");
    fdfTrace("input parameters: \n");
    fdfTrace("signal_data   uncompressed raw SAR signal data filename\n");
    fdfTrace("rc_data       output range compressed data filename\n");
    fdfTrace("proc_par      processing parameter file\n");
    fdfTrace("prefilter     prefilter decimation factor\n");
    fdfTrace("offset        offset #echoes for first line to process\n");
    fdfTrace("nl            number of lines to prefilter/range compress\n");
    fdfTrace("aRgFFTSize    range FFT size\n");
}

/// The processed channel: the last entry of "ChannelInfo.Description" equal to the requested one.
void fSelectChannel(const CDescriptionHeader& theInput, const CDescriptionHeader& thePar, CRangeCompressionRun& r)
{
    const CDescriptionField& aList = theInput["ChannelInfo.Description"];
    const std::string aWanted = fqorvHasValue(thePar, "sar_processing.Channel") ? thePar["sar_processing.Channel"].getString() : "";
    const int aCount = aList.isInitialised() ? aList.getNbrOfElements() : 0;
    int aFound = -1;
    for (int c = 0; c < aCount; ++c)
        if (aWanted == aList.getString(c)) aFound = c;
    if (aFound < 0) {
        fdfTrace("Error: the requested polarization/channel is not in the raw data\n");
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "the requested polarization/channel is not in the raw data");
    }
    r.mChannel = aFound;
    fdfTrace("Processing channel/polarization: %s\n", aWanted.c_str());
    fdfTrace("Processing channel/polarization # %d out of %d\n", aFound + 1, aCount);
    fdfTrace("Acquisition mode: Stripmap\n");
}

/// The continuity layout: sensor, product, prefix positions (header values win; 32 means 54).
void fContinuityLayout(CDescriptionHeader& theInput, CRangeCompressionRun& r)
{
    CContinuityLayout& l = r.mLayout;
    l.mSensor = fqorvSensorStrToID(theInput["Sensor.SensorName"].getString());
    std::string aOrigin;
    l.mProduct = fqorvGetUserKey(theInput, "ORIGIN DATA", aOrigin) ? fqorvOrigProdStrToID(aOrigin.c_str()) : -1;
    CLineContinuity::defaultPositions(l.mSensor, l.mCounterPos, l.mSwstPos);
    if (fqorvHasValue(theInput, "Processing.LineCounterFirstBytePos")) {
        l.mCounterPos = theInput["Processing.LineCounterFirstBytePos"].getInteger();
        if (l.mCounterPos == 32) {
            l.mCounterPos = 54;
            theInput["Processing.LineCounterFirstBytePos"].setValue(54);
        }
    }
    if (fqorvHasValue(theInput, "Processing.SWSTFirstBytePos")) l.mSwstPos = theInput["Processing.SWSTFirstBytePos"].getInteger();
    l.mPrefixBytes = r.mPrefixBytes;
    l.mPixelSpacing = r.mPixelSpacing;
    l.mRangeOut = r.aRangeOut;
    if (!CLineContinuity::isChecked(l.mSensor)) return;
    fdfTrace("checking for missing lines\nchecking for swst change\n");
    fdfTrace("Line Counter First Byte Pos : %d\n", l.mCounterPos);
    fdfTrace("SWST First Byte Pos : %d\n", l.mSwstPos);
    // Every value read from a prefix must lie inside it.
    const bool aRange = CLineContinuity::hasSlantRange(l.mProduct);
    const bool aBad = l.mCounterPos < 0 || l.mCounterPos + 4 > r.mPrefixBytes ||
                      (!aRange && l.mSwstPos >= 0 && l.mSwstPos + 2 > r.mPrefixBytes) || (aRange && 116 + 4 > r.mPrefixBytes);
    if (aBad) {
        fdfTrace("Error: line counter or SWST bytes (%d, %d) outside the record prefix of %d bytes\n", l.mCounterPos,
                 l.mSwstPos, r.mPrefixBytes);
        QORV_FATAL(CQORV_ERR_RASTER_ACCESS, "Processing.LineCounterFirstBytePos");
    }
}

/// Arguments and headers, the channel and the sizes.
void fSetUp(int argc, char** argv, CRangeCompressionRun& r, std::unique_ptr<CDescriptionHeader>& theInput,
            std::unique_ptr<CDescriptionHeader>& thePar)
{
    r.mInput = argv[1];
    r.mOutput = argv[2];
    r.mParFile = argv[3];
    r.mWriteName = r.mOutput + "_tmp";
    CDescriptionHeader& in = *theInput;
    CDescriptionHeader& par = *thePar;
    r.D = argc > 4 ? std::atoi(argv[4]) : par["sar_processing.AzPresumming"].getInteger();
    r.mFirstLine = argc > 5 ? std::atoi(argv[5]) : par["sar_processing.FirstLine"].getInteger();
    r.nl = argc > 6 ? std::atoi(argv[6]) : par["sar_processing.ProcessedLines"].getInteger();
    r.N = argc > 7 ? std::atoi(argv[7]) : par["sar_processing.RgFFT"].getInteger();
    if (r.N < 1024) r.N = 1024;
    if (r.D < 1) r.D = 1;
    r.F = fqorvHasValue(in, "sar_processing.FirstPixel")    ? in["sar_processing.FirstPixel"].getInteger()
          : fqorvHasValue(par, "sar_processing.FirstPixel") ? par["sar_processing.FirstPixel"].getInteger()
                                                     : 0;
    if (r.mFirstLine < 0) {
        fdfTrace("negative line offsets not permitted!\n");
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "negative line offsets not permitted!");
    }
    if (r.nl < r.D) {
        fdfTrace("Error: %d lines to compress with a decimation factor of %d\n", r.nl, r.D);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "sar_processing.ProcessedLines");
    }
    if (fqorvHasValue(par, "sar_processing.AzBandWidthFraction")) r.mBandFraction = par["sar_processing.AzBandWidthFraction"].getDouble();
    fdfTrace("prefilter decimation factor:            %d\n", r.D);
    fdfTrace("offset #echoes for first line:          %d\n", r.mFirstLine);
    fdfTrace("number of lines to prefilter/compress:  %d\n", r.nl);
    fdfTrace("range FFT size:                         %d\n", r.N);

    fSelectChannel(in, par, r);
    r.mLineLength = in["RasterInfo.NrOfPixelsPerLine"].getInteger();
    if (r.F < 0 || r.F >= r.mLineLength) {
        fdfTrace("Error: first pixel %d outside the line of %d samples\n", r.F, r.mLineLength);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "sar_processing.FirstPixel");
    }
    r.mChannelBase = r.mChannel * in["RasterInfo.NrOfLinesPerImage"].getInteger();
    const int c = r.mChannel;
    r.mChirp.mFftSize = r.N;
    r.mChirp.mLineLength = r.mLineLength;
    r.mChirp.mCarrier = in["ChannelInfo.CarrierFrequency"].getDouble(c);
    r.mChirp.mSamplingRate = in["ChannelInfo.SamplingRate"].getDouble(c);
    r.mChirp.mPulseDuration = in["ChannelInfo.PulseDuration"].getDouble(c);
    r.mChirp.mBandwidth = in["ChannelInfo.BandWidth"].getDouble(c);
    r.mPrf = in["ChannelInfo.PRF"].getDouble(c);
    r.mChirpText = fqorvHasValue(in, "Sensor.Chirp") ? in["Sensor.Chirp"].getString() : "";
    r.mSpectrumText = fqorvHasValue(in, "Sensor.Spectrum") ? in["Sensor.Spectrum"].getString() : "";
    r.mChirp.mChirp = r.mChirpText.c_str();
    r.mChirp.mSpectrum = r.mSpectrumText.c_str();
    r.mChirp.mBaseband = fqorvHasValue(in, "Sensor.Baseband") && std::strcmp(in["Sensor.Baseband"].getString(), "YES") == 0;
    // Each refusal names the field at fault.
    const std::pair<const char*, bool> aChirpValues[] = {{"ChannelInfo.SamplingRate", r.mChirp.mSamplingRate > 0.0},
                                                         {"ChannelInfo.PulseDuration", r.mChirp.mPulseDuration >= 0.0},
                                                         {"ChannelInfo.PRF", r.mPrf > 0.0}};
    for (const auto& [aKey, aPossible] : aChirpValues) {
        if (aPossible) continue;
        fdfTrace("Error: sampling rate %g, pulse duration %g, PRF %g\n", r.mChirp.mSamplingRate, r.mChirp.mPulseDuration, r.mPrf);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, aKey);
    }
    r.mSwstNullValue = fqorvHasValue(in, "Processing.SWST_null_value_used") ? in["Processing.SWST_null_value_used"].getInteger() : 0;
    r.mPixelSpacing = CSAR_C / (r.mChirp.mSamplingRate * 2.0);

    r.aWidth = std::min(r.mLineLength - r.F, r.N);
    r.aLastColumn = r.F - 1 + r.aWidth;
    r.aChirpUsed = static_cast<int>(std::ceil(r.mChirp.mSamplingRate * r.mChirp.mPulseDuration));
    while (r.aChirpUsed > r.mLineLength / 2) r.aChirpUsed /= 2;
    r.aRangeOut = std::min(r.N - r.aChirpUsed, r.mLineLength - r.F - r.aChirpUsed);
    fdfTrace("#range samples/output line: %d\n", r.aRangeOut);
    fdfTrace("radians/slant range pixel: %f\n", 2.0 * (2.0 * M_PI * r.mChirp.mCarrier / CSAR_C) * r.mPixelSpacing);
    if (r.aRangeOut < 1) {
        fdfTrace("Error: no range sample left per output line\n");
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "RasterInfo.NrOfPixelsPerLine");
    }
}

/// The replica must fit the range transform.
void fCheckReplica(const CRangeCompressionRun& r)
{
    const int aPoints = fqorvChirpPoints(r.mChirp.mSamplingRate, r.mChirp.mPulseDuration);
    if (aPoints > r.N) {
        fdfTrace("ERROR: #samples in the chirp %d exceeds #points in the processed range swath %d\n", aPoints, r.N);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, " #samples in the chirp exceeds #points in the processed range swath ");
    }
}

/// Reduces a per-channel vector of numbers to the chosen channel's value.
void fKeepChannel(CDescriptionHeader& theOut, const char* theKey, int theChannel)
{
    CDescriptionField& f = theOut[theKey];
    if (!f.isInitialised() || f.getNbrOfElements() <= theChannel) return;
    if (f.mDataType == CQORV_DT_STRING) {
        const std::string v = f.getString(theChannel);
        f.resize(1, 1);
        f.setValue(0, v);
    } else {
        const double v = f.getDouble(theChannel);
        f.resize(1, 1);
        f.setValue(0, v);
    }
}

/// The output header (written before any line) and the output raster under its temporary name.
std::unique_ptr<CDescriptionHeader> fOutputHeader(const CDescriptionHeader& theInput, const CDescriptionHeader& thePar,
                                                  const CRangeCompressionRun& r, CRasterFile& theOut)
{
    std::unique_ptr<CDescriptionHeader> aOut = CDescriptionHeader::makeFull();
    aOut->copyFrom(theInput, false);
    CDescriptionHeader& o = *aOut;
    const double fs = r.mChirp.mSamplingRate;
    const double aFastTime0 = theInput["Processing.FastTime"].getDouble(0);
    const double r0 = aFastTime0 * CSAR_C / 2.0;
    const double aIndex[3] = {static_cast<double>(r.F), r.F - 1 + r.aRangeOut / 2.0, static_cast<double>(r.F - 1 + r.aRangeOut)};
    o["Processing.SlantRange"].resize(1, 3);
    o["Processing.FastTime"].resize(1, 3);
    for (int k = 0; k < 3; ++k) {
        o["Processing.SlantRange"].setValue(k, aIndex[k] * r.mPixelSpacing + r0);
        o["Processing.FastTime"].setValue(k, aIndex[k] / fs + aFastTime0);
    }
    o["Processing.PixelSpacingRg"].setValue(r.mPixelSpacing);
    // The replica's Kaiser weighting widens the response by 1.4.
    o["Processing.ResolutionRange"].setValue(419709441.2 / (r.mChirp.mBandwidth * 2.0));
    o["RasterInfo.CellType"].setValue("FLOAT_COMPLEX");
    o["RasterInfo.NrOfPixelsPerLine"].setValue(r.aRangeOut);
    o["RasterInfo.NrOfLinesPerImage"].setValue(r.nl / r.D);
    o["RasterInfo.NrOfChannels"].setValue(1);
    for (const char* aKey : {"RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix"}) o[aKey].setValue(0);
    o["RasterInfo.NullCellValue"].setValue(0.0);
    for (const char* aKey : {"ChannelInfo.Description", "ChannelInfo.CarrierFrequency", "ChannelInfo.SamplingRate",
                             "ChannelInfo.PulseDuration", "ChannelInfo.BandWidth", "ChannelInfo.PRF"})
        fKeepChannel(o, aKey, r.mChannel);
    o["Processing.NAzimuthLooks"].setValue(thePar["sar_processing.AzPresumming"].getInteger());
    o["Processing.NRangeLooks"].setValue(1);
    const uint16_t aProbe = 1;
    o["RasterInfo.BytesOrder"].setValue(*reinterpret_cast<const uint8_t*>(&aProbe) == 1 ? "LSBF" : "MSBF");

    const bool aLat = fqorvHasValue(theInput, "RegistrationCoordinates.LatNorthing");
    const bool aLon = fqorvHasValue(theInput, "RegistrationCoordinates.LonEasting");
    if (!aLat) QORV_WARNING(CQORV_WARN_COORDINATES, "Latitude Northing");
    if (!aLon) QORV_WARNING(CQORV_WARN_COORDINATES, "Longitude Easting");
    if (!aLat || !aLon) {
        YDF_ORBIT aOrbit;
        aOrbit.orbit(nullptr, 0.0f, false, &o, 0, 1);
        fdfTrace("Mean altitude = %f\n", aOrbit.meanAltitude(o));
    }
    // Stored before the line loop, so it always reads zeros.
    char aText[64];
    std::snprintf(aText, sizeof aText, "POSITION[%d]  VALUE[%d]", 0, 0);
    fqorvSetUserKey(o, "MISSING LINE INFO", aText);

    const std::string aHeaderName = r.mWriteName + "_hdr";
    fdfTrace("writing new parameters to parameter file %s\n", aHeaderName.c_str());
    if (!o.write(aHeaderName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aHeaderName.c_str());
    }
    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(o, r.mWriteName.c_str(), aParam);
    theOut.openWrite(CQORV_RF_OPEN_WRITE, aParam);
    return aOut;
}


/// What the line loops share: the files, the filter, the continuity state and the work line.
struct CLoopState {
    CRasterFile& mIn;
    CRasterFile& mOut;
    const CRangeCompressor& mCompressor;
    CLineContinuity& mContinuity;
    CIqOffsets mOffsets;
    FftBuffer mWork;
    std::vector<uint8_t> mPrefix;
    int mPercent = 0;
    long long mDone = 0;  // lines already reported (the offset estimate counts as the first half)
};

/// The I/Q offsets: from the header's estimates, 0 for float data, else measured over the lines.
CIqOffsets fIqOffsets(const CDescriptionHeader& theInput, CLoopState& s, const CRangeCompressionRun& r)
{
    CIqOffsets aOffsets;
    std::string aI, aQ, aImbalance;
    if (fqorvGetUserKey(theInput, "OTHER_INFO_I_ESTIMATION", aI) && fqorvGetUserKey(theInput, "OTHER_INFO_Q_ESTIMATION", aQ) &&
        fqorvGetUserKey(theInput, "OTHER_INFO_IQ_INBALANCE_ESTIMATION", aImbalance)) {
        aOffsets.mI = std::atof(aI.c_str());
        aOffsets.mQ = std::atof(aQ.c_str());
        aOffsets.mImbalance = std::atof(aImbalance.c_str());
    } else if (s.mIn.getCellType() != CQORV_CELL_FLOAT_COMPLEX) {
        fdfTrace("NQORV_UTILITY::minValue<int>(aNbrLinesProcessed, CQORV_LINES_NBR_DC_BIAS_EST): %d\n",
                 std::min(r.nl, CQORV_LINES_NBR_DC_BIAS_EST));
        CIqOffsetEstimate aEstimate;
        std::vector<fcomplex> aLine(static_cast<std::size_t>(r.mLineLength));
        for (int i = 0; i < r.nl; ++i) {
            const int aRow = r.mFirstLine + i + r.mChannelBase;
            if (aRow >= r.mRasterLines) break;
            fdfProgress(s.mPercent, i, 2LL * r.nl);
            fqorvReadLine(s.mIn, aLine.data(), aRow);
            aEstimate.add(aLine.data() + r.F, r.aWidth);
        }
        aOffsets = aEstimate.result();
        s.mDone = r.nl;  // the line loop reports the second half
        fdfTrace("number of sample points in DC bias sum: %lld\n", aEstimate.count());
    }
    fdfTrace("I channel offset:      %f\n", aOffsets.mI);
    fdfTrace("Q channel offset:      %f\n", aOffsets.mQ);
    fdfTrace("I/Q channel inbalance: %f\n", aOffsets.mImbalance);
    return aOffsets;
}

/// Reads record theRow, columns F .. aLastColumn, into theBuffer at theAt, and its prefix.
void fReadRecord(CLoopState& s, const CRangeCompressionRun& r, int theRow, fcomplex* theBuffer)
{
    fqorvReadLine(s.mIn, theBuffer, theRow, r.F, r.aLastColumn);
    if (!s.mPrefix.empty()) std::memcpy(s.mPrefix.data(), s.mIn.lastRecordPrefix(), s.mPrefix.size());
}

/// Compresses the work line, applies the shift and writes aRangeOut samples as theLine.
void fCompressAndWrite(CLoopState& s, const CRangeCompressionRun& r, int theLine, bool theNullValueRule)
{
    fcomplex* w = s.mWork.data();
    s.mCompressor.compress(w);
    fqorvShiftLine(w, r.aRangeOut, s.mContinuity.shift());
    const int v = r.mSwstNullValue;
    if (theNullValueRule && v < 0) std::fill(w + std::max(0, r.aRangeOut + v), w + r.aRangeOut, fcomplex(0.0f, 0.0f));
    if (theNullValueRule && v > 0) std::fill(w, w + std::min(v, r.aRangeOut), fcomplex(0.0f, 0.0f));
    fqorvWriteLine(s.mOut, w, theLine);
}

/// The line loop without presumming: one record, one output line.
void fDirectLoop(CLoopState& s, const CRangeCompressionRun& r)
{
    fcomplex* w = s.mWork.data();
    const std::size_t aWorkSize = s.mWork.size();
    int aActRow = r.mChannelBase;
    for (int i = 0; i < r.nl; ++i) {
        fdfProgress(s.mPercent, s.mDone + i, s.mDone + r.nl);
        std::fill(w, w + aWorkSize, fcomplex(0.0f, 0.0f));
        if (i % CQORV_TRACE_EVERY == 0) fdfTrace("range line: %d\n", i);
        if (aActRow >= r.mRasterLines) {
            fqorvWriteLine(s.mOut, w, i);
            continue;
        }
        fReadRecord(s, r, aActRow, w + r.F);
        const CContinuityDecision d = s.mContinuity.check(s.mPrefix.data(), CContinuityRoad::Direct, i, aActRow);
        if (d.mDrop) {
            // A repeated record: the next record takes this output line.
            ++aActRow;
            --i;
            continue;
        }
        // Lost lines are filled with the echo in hand, still raw, each shifted once more by the
        // shift in force before this record's SWST code.
        for (int k = 0; k < d.mFillers && i < r.nl; ++k) {
            fqorvShiftLine(w, r.aRangeOut, d.mFillerShift);
            fqorvWriteLine(s.mOut, w, i++);
        }
        i += d.mSkip;
        ++aActRow;
        if (i >= r.nl) break;
        if (!fqorvIsConstantLine(w + r.F, r.aWidth)) fqorvRemoveIqOffsets(w, r.aWidth, s.mOffsets);
        fCompressAndWrite(s, r, i, true);
    }
}

/// The prefilter's circular buffer of rows over one zeroed block.
struct CRowBuffer {
    std::vector<fcomplex> mBlock;
    std::vector<fcomplex*> mRows;
    CRowBuffer(int theRows, int theLength)
        : mBlock(static_cast<std::size_t>(theRows) * static_cast<std::size_t>(theLength)), mRows(static_cast<std::size_t>(theRows))
    {
        for (int k = 0; k < theRows; ++k) mRows[static_cast<std::size_t>(k)] = mBlock.data() + static_cast<std::size_t>(k) * theLength;
    }
};

/// Reads the next record into theRow for the buffer roads: continuity, then offset correction.
/// Returns false when the fill must end (a repeated record, dropped). theSkip receives the rows or
/// lines to move on.
bool fReadBufferedRow(CLoopState& s, const CRangeCompressionRun& r, int& theActRow, fcomplex* theRow,
                      CContinuityRoad theRoad, int theLine, int& theSkip)
{
    fReadRecord(s, r, theActRow, theRow);
    const CContinuityDecision d = s.mContinuity.check(s.mPrefix.data(), theRoad, theLine, theActRow);
    ++theActRow;
    theSkip = d.mSkip;
    if (d.mDrop) {
        std::fill(theRow, theRow + r.N, fcomplex(0.0f, 0.0f));
        return false;
    }
    if (!fqorvIsConstantLine(theRow, r.aWidth)) fqorvRemoveIqOffsets(theRow, r.aWidth, s.mOffsets);
    return true;
}

/// Fills the circular buffer before the prefilter loop; returns the next record.
int fPrime(CLoopState& s, const CRangeCompressionRun& r, CRowBuffer& b)
{
    const int L = r.taps();
    int aActRow = r.mChannelBase + r.mFirstLine - L / 2;
    int aRow = 0;
    if (r.mFirstLine - L / 2 < 0) {
        aActRow = r.mChannelBase;
        aRow = L / 2 - r.mFirstLine;
        fdfTrace("warning: prefilter data buffer begins before available data, offset: %d\n", r.mFirstLine - L / 2);
    }
    while (aRow < r.circularRows() && aActRow < r.mRasterLines) {
        int aSkip = 0;
        if (!fReadBufferedRow(s, r, aActRow, b.mRows[static_cast<std::size_t>(aRow)], CContinuityRoad::Priming, aRow, aSkip)) break;
        aRow += 1 + aSkip;
    }
    return aActRow;
}

/// The prefilter loop: one output line per D input lines from the circular buffer.
void fPrefilterLoop(CLoopState& s, const CRangeCompressionRun& r, const std::vector<fcomplex>& theTaps)
{
    const int L = r.taps();
    const int aRows = r.circularRows();
    CRowBuffer b(aRows, r.N);
    int aActRow = fPrime(s, r, b);
    fdfTrace("presum/range compression...\n");
    fcomplex* w = s.mWork.data();
    int h = 0;
    for (int i = 0; i < r.nl; i += r.D) {
        fdfProgress(s.mPercent, s.mDone + i, s.mDone + r.nl);
        if (i % CQORV_TRACE_EVERY < r.D) fdfTrace("range line: %d\n", i);
        std::fill(w, w + s.mWork.size(), fcomplex(0.0f, 0.0f));
        for (int k = 0; k < L; ++k) {
            const fcomplex t = theTaps[static_cast<std::size_t>(k)];
            const fcomplex* row = b.mRows[static_cast<std::size_t>(h + k)];
            for (int p = 0; p < r.aWidth; ++p) w[p] += t * row[p];
        }
        h += r.D;
        if (h > aRows - L) {
            if (aActRow >= r.mRasterLines) {
                fdfTrace("\n\nwarning: end of input SAR data @data line:%d\n", i);
                break;
            }
            // The used rows 0 .. h-1 take the next records (a repeat ends the fill early).
            bool aFilling = true;
            for (int k = 0; k < h; ++k) {
                fcomplex* aRow = b.mRows[static_cast<std::size_t>(k)];
                std::fill(aRow, aRow + r.N, fcomplex(0.0f, 0.0f));
                if (!aFilling || aActRow >= r.mRasterLines) continue;
                int aSkip = 0;
                aFilling = fReadBufferedRow(s, r, aActRow, aRow, CContinuityRoad::Refill, i, aSkip);
                i += aSkip;  // i counts input lines: the lost ones move it on
            }
            std::rotate(b.mRows.begin(), b.mRows.begin() + h, b.mRows.end());
            h = 0;
        }
        if (i >= r.nl) break;
        fCompressAndWrite(s, r, i / r.D, false);
    }
}

/// Closes the files, gives the product its name and reports the line continuity.
void fFinish(CLoopState& s, const CRangeCompressionRun& r)
{
    s.mOut.close();
    s.mIn.close();
    fqorvRenameProduct(r.mWriteName.c_str(), r.mOutput.c_str());
    fdfTrace("vtest_missing_line_found: %d\n", s.mContinuity.gapEvents());
    fdfTrace("vtest_missing_line_found_total: %lld\n", s.mContinuity.lostLines());
    if (s.mContinuity.largestGap() > 0)
        fdfTrace("largest line gap: %d at line %d\n", s.mContinuity.largestGap(), s.mContinuity.largestGapLine());
}

}  // namespace

int qorv_pre_rc(int argc, char** argv)
{
    fdfTrace("*** prefilter/SAR range compression for complex IQ SAR data v4.5 29-oct-99 xq ***\n");
    if (argc < 4) {
        fUsage(argc > 0 ? argv[0] : nullptr);
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    std::unique_ptr<CDescriptionHeader> aInput =
        fqorvReadStepHeader(std::string(argv[1]) + "_hdr", "Error: missing parameter file ", false);
    if (fqorvHasValue(*aInput, "Processing.UserSkipRangeCompression")) {
        fdfTrace("range compression skipped by the user\n");
        return 0;
    }
    std::unique_ptr<CDescriptionHeader> aPar =
        fqorvReadStepHeader(argv[3], "Error: missing processing parameter file ", true);
    CRangeCompressionRun r;
    fSetUp(argc, argv, r, aInput, aPar);

    CRasterFileParam aInParam;
    fqorvRasterParamFromHeader(*aInput, r.mInput.c_str(), aInParam);
    const int aChannels = std::max(1, aInput->findField("ChannelInfo.Description")->getNbrOfElements());
    aInParam.mNrOfLinesPerImage *= aChannels;
    r.mRasterLines = aInParam.mNrOfLinesPerImage;
    r.mPrefixBytes = aInParam.mRowPrefix;
    fContinuityLayout(*aInput, r);

    // Every later step takes its Doppler centroid from this header: without one it focuses at 0 Hz.
    if (!fqorvHasValue(*aInput, "Processing.DopCenRangeCoeff") && !fqorvHasValue(*aInput, "Processing.RangeDoppler_fref"))
        QORV_WARNING(CQORV_WARN_65281, "Processing.DopCenRangeCoeff: the raw header holds no Doppler centroid, 0 Hz is used");

    std::vector<fcomplex> aTaps;
    if (r.D != 1) {
        for (const char* aKey : {"Processing.DopCenRangeCoeff", "sar_processing.AzBandWidthFraction"}) {
            const CDescriptionHeader& h = std::strncmp(aKey, "sar_", 4) == 0 ? *aPar : *aInput;
            if (!fqorvHasValue(h, aKey)) {
                fdfTrace("Missing mandatory field %s in file %s\n", aKey, std::strncmp(aKey, "sar_", 4) == 0 ? r.mParFile.c_str() : r.mInput.c_str());
                QORV_FATAL(CQORV_ERR_MANDATORY, aKey);
            }
        }
        // The constant term of row 0 in the form at hand: column 2 of the estimator's table.
        const CDescriptionField& aDoppler = (*aInput)["Processing.DopCenRangeCoeff"];
        const bool aTable = fqorvHasValue(*aInput, "Processing.DopplerEstimatedFlag") &&
                            std::strcmp((*aInput)["Processing.DopplerEstimatedFlag"].getString(), "OK") == 0;
        r.mCentroid = aTable ? aDoppler.getDouble(0, 2) : aDoppler.getDouble(0, 0);
        const std::string aListingName = r.mOutput + "prefiller.dat";
        FILE* aListing = std::fopen(aListingName.c_str(), "w");
        if (!aListing) {
            fdfTrace("cannot open FIR prefilter coefficient file: %s\n", aListingName.c_str());
            QORV_FATAL(CQORV_ERR_CREATE_FILE, aListingName.c_str());
        }
        const double bw = r.mBandFraction * 2.0 * M_PI / r.D;
        fdfTrace("FIR prefilter bandpass filter bandwidth (radians): %f\n", bw);
        aTaps = fqorvPrefilterTaps(r.D, r.mBandFraction, 2.0 * M_PI * r.mCentroid / r.mPrf, aListing);
        std::fclose(aListing);
    }
    fCheckReplica(r);
    CRangeCompressor aCompressor(r.mChirp);

    CRasterFile aOut;
    std::unique_ptr<CDescriptionHeader> aOutput = fOutputHeader(*aInput, *aPar, r, aOut);
    CRasterFile aIn;
    aIn.openRead(aInParam);
    const std::string aTraceName = r.mOutput + "_swst.trace", aSwstOnlyName = r.mOutput + "_swst_only.trace";
    std::unique_ptr<FILE, int (*)(FILE*)> aTrace(std::fopen(aTraceName.c_str(), "w"), std::fclose);
    std::unique_ptr<FILE, int (*)(FILE*)> aSwstOnly(std::fopen(aSwstOnlyName.c_str(), "w"), std::fclose);
    CLineContinuity aContinuity(r.mLayout, aTrace.get(), aSwstOnly.get());

    CLoopState s{aIn, aOut, aCompressor, aContinuity, {}, FftBuffer(static_cast<std::size_t>(std::max(r.mLineLength, r.N))),
                 std::vector<uint8_t>(static_cast<std::size_t>(r.mPrefixBytes)), 0, 0};
    s.mOffsets = fIqOffsets(*aInput, s, r);
    if (r.D == 1) {
        fDirectLoop(s, r);
    } else {
        fPrefilterLoop(s, r, aTaps);
    }
    aTrace.reset();
    aSwstOnly.reset();
    fFinish(s, r);
    std::remove(aTraceName.c_str());
    std::remove(aSwstOnlyName.c_str());
    return 0;
}
