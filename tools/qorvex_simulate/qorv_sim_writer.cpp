#include "qorv_sim_writer.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <memory>
#include <stdexcept>
#include <thread>
#include <vector>

#include "qorv_cell_types.h"
#include "qorv_description_section.h"
#include "qorv_generic_utility.h"
#include "qorv_raster_file.h"
#include "qorv_sim_alos.h"
#include "qorv_sim_asar.h"
#include "qorv_sim_echo.h"
#include "qorv_sim_format.h"
#include "qorv_sim_header.h"
#include "qorv_sim_native.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_truth.h"

namespace {

constexpr double CQORV_SIM_LIGHT = 299792458.0;
/// Pulses generated together, spread over the threads; bounds the memory of a run.
constexpr long CQORV_SIM_BLOCK = 128;

double secondsSince(std::chrono::steady_clock::time_point theStart)
{
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - theStart).count();
}

int threadCount(const CSimScene& s)
{
    const int aHardware = fqorvThreadCount();
    return std::clamp(s.mThreads > 0 ? s.mThreads : aHardware, 1, 64);
}

/// Bytes of one encoded line: I,Q bytes, decoded floats, or an ASAR packet's FBAQ blocks.
int lineBytes(const CSimScene& s)
{
    if (s.mArchive == CSimArchive::Asar) return fqorvSimFbaqBytes(s.mSamples);
    return s.mSamples * (s.mFormat == CSimSampleFormat::Ubyte5Bit ? 2 : 8);
}

/// One block of pulses: encoded samples and clip counts, per pulse.
struct CBlock {
    long mFirst = 0;
    long mCount = 0;
    int mBytesPerLine = 0;
    std::vector<uint8_t> mBytes;
    std::vector<long> mClipped;
};

/// Generates and encodes pulses [first, first + count) of a block; pulses are dealt to the threads
/// in turn, each with its own line buffer.
void generateBlock(const CSimScene& s, const CSimEchoGenerator& theGenerator, double theGain, int theThreads, CBlock& b)
{
    auto work = [&](int theThread) {
        std::vector<CSimSample> aLine(static_cast<std::size_t>(s.mSamples));
        for (long i = theThread; i < b.mCount; i += theThreads) {
            const long k = b.mFirst + i;
            theGenerator.echo(k, aLine.data());
            theGenerator.addNoise(k, aLine.data());
            uint8_t* out = b.mBytes.data() + static_cast<std::size_t>(i) * b.mBytesPerLine;
            if (s.mArchive == CSimArchive::Asar)
                b.mClipped[i] = fqorvSimFbaqEncoder().encode(aLine.data(), s.mSamples, theGain, out);
            else if (s.mFormat == CSimSampleFormat::Ubyte5Bit)
                b.mClipped[i] = fqorvSimQuantiseBytes(aLine.data(), s.mSamples, theGain, s.mCodeBits, out);
            else
                b.mClipped[i] = fqorvSimQuantiseBaq4Bit(aLine.data(), s.mSamples, reinterpret_cast<float*>(out));
        }
    };
    if (theThreads == 1) {
        work(0);
        return;
    }
    std::vector<std::thread> aPool;
    for (int t = 0; t < theThreads; ++t) aPool.emplace_back(work, t);
    for (std::thread& t : aPool) t.join();
}

CRasterFileParam rasterParam(const CSimScene& s, const CSimTimeline& tl, const std::string& thePath)
{
    CRasterFileParam p;
    p.mFileName = thePath;
    p.mNrOfLinesPerImage = static_cast<int32_t>(tl.records().size());
    p.mNrOfPixelsPerLine = s.mSamples;
    p.mCellType = s.mFormat == CSimSampleFormat::Ubyte5Bit ? CQORV_CELL_UBYTE_COMPLEX : CQORV_CELL_FLOAT_COMPLEX;
    p.mDataUnits = s.mDataUnits == "ERS RAW" ? CQORV_UNITS_ERS_RAW : -1;
    p.mHeaderLen = s.mHeaderOffset;
    p.mRowPrefix = s.mPrefix.mSize;
    p.mRowSuffix = 0;
    p.mFooterLen = 0;
    p.mDummyVal = -9999.0;
    p.mByteOrderMSBF = true;
    return p;
}

/// Takes one record: the record, its index in the file and its encoded samples.
using CRecordSink = std::function<void(const CSimRecord& theRecord, std::size_t theIndex, const uint8_t* theSamples)>;

/// Generates the scene block by block and hands every record, in file order, to theSink.
void streamRecords(const CSimScene& s, const CSimTimeline& tl, const CSimEchoGenerator& theGenerator, double theGain,
                   const CRecordSink& theSink, CSimRunReport& theReport, const CSimProgress& theProgress)
{
    const int aThreads = threadCount(s);
    theReport.mThreads = aThreads;
    CBlock b;
    b.mBytesPerLine = lineBytes(s);
    b.mBytes.resize(static_cast<std::size_t>(CQORV_SIM_BLOCK) * b.mBytesPerLine);
    b.mClipped.resize(CQORV_SIM_BLOCK);
    const std::vector<CSimRecord>& aRecords = tl.records();
    std::size_t aRecord = 0;
    long aClipped = 0;
    int aPercent = -1;
    for (long aFirst = 0; aFirst < s.mPulses; aFirst += CQORV_SIM_BLOCK) {
        b.mFirst = aFirst;
        b.mCount = std::min(CQORV_SIM_BLOCK, s.mPulses - aFirst);
        generateBlock(s, theGenerator, theGain, aThreads, b);
        for (long i = 0; i < b.mCount; ++i) aClipped += b.mClipped[i];
        // The records of the block's pulses, in file order (dropped pulses have none).
        for (; aRecord < aRecords.size() && aRecords[aRecord].mPulse < aFirst + b.mCount; ++aRecord) {
            const CSimRecord& r = aRecords[aRecord];
            theSink(r, aRecord, b.mBytes.data() + static_cast<std::size_t>(r.mPulse - aFirst) * b.mBytesPerLine);
        }
        const int aNow = static_cast<int>(100 * (aFirst + b.mCount) / s.mPulses);
        if (theProgress && aNow != aPercent) theProgress(aNow);
        aPercent = aNow;
    }
    theReport.mRecords = static_cast<long>(aRecords.size());
    theReport.mClippedFraction = static_cast<double>(aClipped) / (2.0 * s.mPulses * s.mSamples);
}

/// The byte-code gain: codes per unit amplitude so that each component's rms is mRmsDn 5-bit codes
/// (the same fraction of the full scale for wider codes), the signal
/// power estimated from noise-free echoes of 64 pulses spread over the scene. FBAQ (ASAR): the
/// scale that brings each component's rms to 1, the middle of the code book's gains.
double quantiserGain(const CSimScene& s, const CSimEchoGenerator& g, double& theSignalPower)
{
    theSignalPower = g.meanSignalPower(static_cast<int>(std::min<long>(64, s.mPulses)));
    if (s.mGain > 0.0) return s.mGain;
    const double aComponentPower = 0.5 * (theSignalPower + g.noiseVariance());
    const double aRms = s.mArchive == CSimArchive::Asar ? 1.0 : s.mRmsDn * static_cast<double>(1 << (s.mCodeBits - 5));
    return aComponentPower > 0.0 ? aRms / std::sqrt(aComponentPower) : 1.0;
}

/// The sink of the chain's raw raster: each record's prefix and samples through CRasterFile.
CRecordSink rasterSink(const CSimScene& s, const CSimTimeline& tl, CRasterFile& theRaster)
{
    const int aBytes = lineBytes(s);
    auto aPixels = std::make_shared<std::vector<uint8_t>>(static_cast<std::size_t>(aBytes));
    auto aPrefix = std::make_shared<std::vector<uint8_t>>(static_cast<std::size_t>(s.mPrefix.mSize));
    return [&s, &tl, &theRaster, aPixels, aPrefix, aBytes](const CSimRecord& r, std::size_t theIndex, const uint8_t* theSamples) {
        CSimPrefixValues v;
        v.mCounter = r.mCounter;
        v.mSwstCode = tl.swstCode(r.mPulse);
        v.mPriCode = tl.priCode(r.mPulse);
        v.mSlantRange = static_cast<int32_t>(std::lround(0.5 * CQORV_SIM_LIGHT * tl.windowDelay(r.mPulse)));
        // Seeded by the pulse: a repeated record is a byte-for-byte copy, as in the archives.
        fqorvSimEncodePrefix(s.mPrefix, v, s.mSeed, static_cast<uint64_t>(r.mPulse), aPrefix->data());
        theRaster.setRowPrefix(aPrefix->data());
        // The write swaps the buffer it is given: hand it a copy.
        std::copy(theSamples, theSamples + aBytes, aPixels->begin());
        theRaster.writeLines(static_cast<int>(theIndex), 1, aPixels->data());
    };
}

/// Sets the quantiser's gain and the figures of the echo generator.
void startFigures(const CSimScene& s, const CSimEchoGenerator& g, CSimRunFigures& theFigures)
{
    theFigures.mGain = quantiserGain(s, g, theFigures.mSignalPower);
    theFigures.mNoiseVariance = g.noiseVariance();
    theFigures.mAzimuthGain = g.azimuthGain();
    theFigures.mRangeGain = g.rangeGain();
}

void writeRecordsWith(const CSimScene& s, const CSimTimeline& tl, const CSimEchoGenerator& g, const CRecordSink& theSink,
                      CSimRunReport& theReport, CSimRunFigures& theFigures, const CSimProgress& theProgress)
{
    const auto aStart = std::chrono::steady_clock::now();
    startFigures(s, g, theFigures);
    streamRecords(s, tl, g, theFigures.mGain, theSink, theReport, theProgress);
    theReport.mGain = theFigures.mGain;
    theFigures.mClippedFraction = theReport.mClippedFraction;
    theReport.mPulses = s.mPulses;
    theReport.mEchoSeconds = secondsSince(aStart);
}

void writeRasterWith(const CSimScene& s, const CSimTimeline& tl, const CSimEchoGenerator& g, const std::string& thePath,
                     CSimRunReport& theReport, CSimRunFigures& theFigures, const CSimProgress& theProgress)
{
    CRasterFile aRaster;
    aRaster.openWrite(CQORV_RF_OPEN_WRITE, rasterParam(s, tl, thePath));
    writeRecordsWith(s, tl, g, rasterSink(s, tl, aRaster), theReport, theFigures, theProgress);
    aRaster.close();
}

void countTargets(const CSimScene& s, CSimRunReport& r)
{
    for (const CSimTarget& t : s.mTargets) (t.mListed ? r.mTargets : r.mScatterers) += 1;
}

std::string baseName(const std::string& thePath)
{
    const std::size_t aSlash = thePath.find_last_of('/');
    return aSlash == std::string::npos ? thePath : thePath.substr(aSlash + 1);
}

}  // namespace

void fqorvSimWriteRaster(const CSimScene& theScene, const std::string& thePath, CSimRunReport& theReport,
                         const CSimProgress& theProgress)
{
    const std::unique_ptr<CSimOrbit> aOrbit = fqorvSimMakeOrbit(theScene);
    const CSimTimeline aTimeline(theScene);
    const CSimEchoGenerator aGenerator(theScene, *aOrbit, aTimeline);
    CSimRunFigures aFigures;
    countTargets(theScene, theReport);
    writeRasterWith(theScene, aTimeline, aGenerator, thePath, theReport, aFigures, theProgress);
}

namespace {

/// What differs between the writers of native archives, opened on the scene's geometry: where
/// the archive goes, how a record is written, what the archive adds to the truth, and its rename
/// into place.
struct CArchiveSink {
    std::filesystem::path mPath;
    CRecordSink mWrite;
    std::function<void(CJson& theTruth, const CSimRunFigures& theFigures)> mAddTruth;
    std::function<void()> mFinish;
};
using COpenArchive = std::function<CArchiveSink(const CSimTimeline&, const CSimOrbit&, const CSimSceneTruth&)>;

/// A native archive: records through the archive's writer, the truth file, then the archive
/// renamed into place.
CSimRunReport runArchive(const CSimScene& theScene, const std::string& theRoot, const CSimProgress& theProgress,
                         const COpenArchive& theOpen)
{
    const auto aStart = std::chrono::steady_clock::now();
    CSimRunReport aReport;
    aReport.mTruth = theRoot + "_truth.json";
    countTargets(theScene, aReport);
    std::remove(aReport.mTruth.c_str());

    const std::unique_ptr<CSimOrbit> aOrbit = fqorvSimMakeOrbit(theScene);
    const CSimTimeline aTimeline(theScene);
    const CSimEchoGenerator aGenerator(theScene, *aOrbit, aTimeline);
    const CSimSceneTruth aTruth = fqorvSimComputeTruth(theScene, *aOrbit, aTimeline);
    const CArchiveSink aArchive = theOpen(aTimeline, *aOrbit, aTruth);
    aReport.mRaster = aArchive.mPath.string();

    CSimRunFigures aFigures;
    writeRecordsWith(theScene, aTimeline, aGenerator, aArchive.mWrite, aReport, aFigures, theProgress);

    aFigures.mRasterName = aArchive.mPath.filename().string();
    CJson aTruthJson = fqorvSimTruthJson(theScene, aTruth, aTimeline, *aOrbit, aFigures);
    aArchive.mAddTruth(aTruthJson, aFigures);
    aTruthJson.dumpFile(aReport.mTruth);
    aArchive.mFinish();
    aReport.mSeconds = secondsSince(aStart);
    return aReport;
}

/// An ERS CEOS or ENVISAT-format archive.
CArchiveSink openErsArchive(const CSimScene& theScene, const std::string& theRoot, const CSimTimeline& theTimeline,
                            const CSimOrbit& theOrbit, const CSimSceneTruth& theTruth)
{
    const std::filesystem::path aPath = fqorvSimArchivePath(theScene, theRoot);
    const auto aProduct = std::make_shared<const CSimNativeProduct>(fqorvSimSceneProduct(theScene, theTimeline, theOrbit, theTruth));
    const std::shared_ptr<CSimNativeWriter> aWriter = fqorvSimOpenNativeWriter(
        theScene.mArchive == CSimArchive::Ceos ? CSimNativeFormat::Ceos : CSimNativeFormat::Envisat, *aProduct, aPath);
    return {aPath,
            [&theScene, &theTimeline, aProduct, aWriter](const CSimRecord& r, std::size_t, const uint8_t* theSamples) {
                aWriter->writeLine(fqorvSimSceneLine(theScene, theTimeline, aProduct->mClock, r), theSamples);
            },
            [&theScene, &theTimeline, aProduct, aPath](CJson& theJson, const CSimRunFigures&) {
                fqorvSimAddArchiveTruth(theJson, theScene, theTimeline, *aProduct, aPath);
            },
            [aWriter, aProduct] { aWriter->finish(); }};
}

/// An ALOS product directory.
CArchiveSink openAlosArchive(const CSimScene& theScene, const std::string& theRoot, const CSimTimeline& theTimeline,
                             const CSimOrbit& theOrbit, const CSimSceneTruth& theTruth)
{
    const std::filesystem::path aPath = theRoot;
    const auto aProduct = std::make_shared<const CSimAlosProduct>(fqorvSimAlosSceneProduct(theScene, theTimeline, theOrbit, theTruth));
    const auto aWriter = std::make_shared<CSimAlosWriter>(*aProduct, aPath);
    return {aPath,
            [&theScene, &theTimeline, aProduct, aWriter](const CSimRecord& r, std::size_t, const uint8_t* theSamples) {
                aWriter->writeLine(fqorvSimAlosSceneLine(theScene, theTimeline, *aProduct, r), theSamples);
            },
            [&theScene, aProduct, aPath](CJson& theJson, const CSimRunFigures&) {
                fqorvSimAddAlosTruth(theJson, theScene, *aProduct, aPath);
            },
            [aWriter, aProduct] { aWriter->finish(); }};
}

/// An ASAR product: the instrument and orbit files and the noise packets first, then a packet per
/// record; the product is renamed into place last.
CArchiveSink openAsarArchive(const CSimScene& theScene, const std::string& theRoot, const CSimTimeline& theTimeline,
                             const CSimOrbit& theOrbit, const CSimSceneTruth& theTruth)
{
    const auto aProduct = std::make_shared<CSimAsarScene>(theScene, theTimeline, theOrbit, theTruth, theRoot);
    return {aProduct->productPath(),
            [aProduct](const CSimRecord& r, std::size_t, const uint8_t* theBlocks) { aProduct->writeRecord(r, theBlocks); },
            [aProduct](CJson& theJson, const CSimRunFigures& theFigures) { aProduct->addTruth(theJson, theFigures.mGain); },
            [aProduct] { aProduct->finish(); }};
}

}  // namespace

CSimRunReport fqorvSimRun(const CSimScene& theScene, const std::string& theRoot, const CSimProgress& theProgress)
{
    using namespace std::placeholders;
    if (theScene.mArchive == CSimArchive::Alos)
        return runArchive(theScene, theRoot, theProgress, std::bind(openAlosArchive, std::cref(theScene), theRoot, _1, _2, _3));
    if (theScene.mArchive == CSimArchive::Asar)
        return runArchive(theScene, theRoot, theProgress, std::bind(openAsarArchive, std::cref(theScene), theRoot, _1, _2, _3));
    if (theScene.mArchive != CSimArchive::Raw)
        return runArchive(theScene, theRoot, theProgress, std::bind(openErsArchive, std::cref(theScene), theRoot, _1, _2, _3));
    const auto aStart = std::chrono::steady_clock::now();
    CSimRunReport aReport;
    aReport.mRaster = theRoot;
    aReport.mHeader = theRoot + ".sml";
    aReport.mTruth = theRoot + "_truth.json";
    countTargets(theScene, aReport);
    // A product is complete when its header exists: take away what an earlier run left.
    std::remove(aReport.mHeader.c_str());
    std::remove(aReport.mTruth.c_str());

    const std::unique_ptr<CSimOrbit> aOrbit = fqorvSimMakeOrbit(theScene);
    const CSimTimeline aTimeline(theScene);
    const CSimEchoGenerator aGenerator(theScene, *aOrbit, aTimeline);
    const CSimSceneTruth aTruth = fqorvSimComputeTruth(theScene, *aOrbit, aTimeline);

    CSimRunFigures aFigures;
    aFigures.mRasterName = baseName(theRoot);
    aFigures.mHeaderName = baseName(aReport.mHeader);
    const std::string aPart = theRoot + ".part";
    writeRasterWith(theScene, aTimeline, aGenerator, aPart, aReport, aFigures, theProgress);
    if (std::rename(aPart.c_str(), theRoot.c_str()) != 0)
        throw std::runtime_error("cannot rename " + aPart + " to " + theRoot);

    fqorvSimTruthJson(theScene, aTruth, aTimeline, *aOrbit, aFigures).dumpFile(aReport.mTruth);

    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    fqorvSimFillHeader(*aHeader, theScene, aTimeline, *aOrbit, aTruth);
    if (!aHeader->write(theRoot.c_str(), true, false)) throw std::runtime_error("cannot write " + aReport.mHeader);
    aReport.mSeconds = secondsSince(aStart);
    return aReport;
}
