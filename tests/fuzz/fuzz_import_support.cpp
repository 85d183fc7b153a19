#include "fuzz_import_support.h"

#include <fcntl.h>
#include <unistd.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <fstream>
#include <iterator>

#include "fuzz_support.h"
#include "qorv_ceos_records.h"
#include "qorv_errors.h"
#include "qorv_import.h"
#include "qorv_import_failure.h"
#include "qorv_line_plan.h"
#include "qorv_product_description.h"
#include "qorv_sim_native.h"

namespace fs = std::filesystem;

namespace qfuzz {

CFixedOrbit::CFixedOrbit(double theStart) : mStart(theStart)
{
    mElements.mM0 = CSimKeplerOrbit::meanAnomalyForArgumentOfLatitude(mElements, 30.0 * CQORV_SIM_DEG);
}

CStateVector CFixedOrbit::vectorAt(double theTime) const
{
    return fqorvSimStateVector(CSimKeplerOrbit(mElements).state(theTime - mStart), theTime);
}

Bytes readAll(const fs::path& thePath)
{
    std::ifstream aIn(thePath, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(aIn), std::istreambuf_iterator<char>());
}

// ------------------------------------------------------------------------------------------------
// Files from inputs

CSparseFile::CSparseFile(const fs::path& thePath) : mFd(::open(thePath.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600))
{
    if (mFd < 0) fault("can't write " + thePath.string());
}

CSparseFile::~CSparseFile()
{
    if (::ftruncate(mFd, static_cast<off_t>(mSize)) != 0) fault("can't size the input file");
    ::close(mFd);
}

void CSparseFile::put(uint64_t theOffset, const uint8_t* theBytes, std::size_t theCount)
{
    if (theCount > 0 && ::pwrite(mFd, theBytes, theCount, static_cast<off_t>(theOffset)) != static_cast<ssize_t>(theCount))
        fault("can't write the input file");
    end(theOffset + theCount);
}

namespace {

uint32_t ceosLength(const uint8_t* theRecord) { return fqorvBigEndianU32(theRecord + 8); }

}  // namespace

Bytes compactCeos(const Bytes& theFile, std::size_t theRecords, std::size_t theFirstKept, std::size_t theKept)
{
    Bytes aOut;
    for (std::size_t o = 0, k = 0; k < theRecords && o + CQORV_CEOS_HEADER_BYTES <= theFile.size(); ++k) {
        const std::size_t aLength = ceosLength(theFile.data() + o);
        const std::size_t aTake = std::min(aLength, k == 0 ? theFirstKept : theKept);
        aOut.insert(aOut.end(), theFile.begin() + static_cast<long>(o), theFile.begin() + static_cast<long>(o + aTake));
        o += aLength;
    }
    return aOut;
}

void writeCeosRecords(const fs::path& thePath, const uint8_t* d, std::size_t n, std::size_t theFirstKept, std::size_t theKept,
                      std::size_t theRecords)
{
    CSparseFile f(thePath);
    uint64_t o = 0;
    for (std::size_t i = 0, k = 0; i < n && k < theRecords; ++k) {
        const uint32_t aLength = n - i >= CQORV_CEOS_HEADER_BYTES ? ceosLength(d + i) : 0;
        if (aLength < CQORV_CEOS_HEADER_BYTES || aLength > CEOS_MAX_RECORD) {
            f.put(o, d + i, n - i);
            return;
        }
        const std::size_t aKept = std::min<std::size_t>(aLength, k == 0 ? theFirstKept : theKept);
        const std::size_t aTake = std::min(aKept, n - i);
        f.put(o, d + i, aTake);
        if (aTake < aKept) return;   // the file ends inside this record
        o += aLength;
        f.end(o);
        i += aTake;
    }
}

void writeSeed(const fs::path& theDir, const std::string& theName, const Bytes& theHead, const Bytes& theFile)
{
    Bytes aSeed = theHead;
    aSeed.insert(aSeed.end(), theFile.begin(), theFile.end());
    const fs::path aPart = theDir / (theName + ".part");
    std::ofstream(aPart, std::ios::binary).write(reinterpret_cast<const char*>(aSeed.data()), static_cast<std::streamsize>(aSeed.size()));
    fs::rename(aPart, theDir / theName);
}

// ------------------------------------------------------------------------------------------------
// What the chain relies on

namespace {

/// The writer copies each line's samples out of its record (ERS, ALOS), or decodes an ASAR line
/// from its packet, which the scan keeps within the file.
void checkLayout(const CNativeArchive& a)
{
    const CNativeRecordLayout& l = a.mLayout;
    if (l.mSamples < 1) fault(std::to_string(l.mSamples) + " samples per line");
    if (!l.mVariable && l.mSamplesPos + 2 * static_cast<uint64_t>(l.mSamples) + l.mSuffix > l.mRecordLength)
        fault(std::to_string(l.mSamples) + " samples and " + std::to_string(l.mSuffix) + " suffix bytes from byte " +
              std::to_string(l.mSamplesPos) + " of records of " + std::to_string(l.mRecordLength) + " bytes");
}

/// The window code of a line as the chain reads it: ERS a SWST code of the valid band, ASAR a SWST
/// within the pulse interval, ALOS a positive slant range.
bool validWindow(ENativeFamily theFamily, const CPlannedLine& l, int thePriCode)
{
    switch (theFamily) {
    case ENativeFamily::Ers: return l.mSwst >= NQORV_ERS::SWST_MIN && l.mSwst <= NQORV_ERS::SWST_MAX;
    case ENativeFamily::Asar: return l.mSwst >= 1 && l.mSwst < thePriCode;
    default: return l.mRange > 0;
    }
}

/// Every line comes from a record of the file (or is a fill line); an ASAR line's packet lies in
/// the file and decodes to no more samples than the product's lines hold; a product's counters
/// start at 1 and never step further than the chain follows beyond the highest before; one PRI
/// code; valid window codes; a PRF and a first pulse time that are finite.
void checkPlan(const CNativeArchive& a, const CLinePlan& thePlan, int64_t theRecords, uint64_t theFileSize, const char* theWhich)
{
    const auto broken = [&](std::size_t p, const std::string& theWhat) {
        fault(std::string(theWhich) + " product " + std::to_string(p) + ": " + theWhat);
    };
    for (std::size_t p = 0; p < thePlan.mProducts.size(); ++p) {
        const CPlannedProduct& x = thePlan.mProducts[p];
        if (x.mLines.empty()) broken(p, "no line");
        if (x.mFirstRecord < 0 || x.mFirstRecord > x.mLastRecord || x.mLastRecord >= theRecords)
            broken(p, "records " + std::to_string(x.mFirstRecord) + " to " + std::to_string(x.mLastRecord));
        if (x.mLines.front().mCounter != 1) broken(p, "first counter " + std::to_string(x.mLines.front().mCounter));
        if (!std::isfinite(x.mFirstPulseTime)) broken(p, "first pulse time not finite");
        if (!(x.mPrf > 0.0 && std::isfinite(x.mPrf))) broken(p, "PRF " + std::to_string(x.mPrf));
        if (x.mSamples < 1) broken(p, std::to_string(x.mSamples) + " samples per line");
        uint32_t aTop = 0;
        for (std::size_t k = 0; k < x.mLines.size(); ++k) {
            const CPlannedLine& l = x.mLines[k];
            const std::string aLine = "line " + std::to_string(k);
            if (l.mSource < -1 || l.mSource >= theRecords) broken(p, aLine + " from record " + std::to_string(l.mSource));
            if (l.mCounter < 1 || l.mCounter > aTop + CQORV_CHAIN_GAP_LIMIT + 1)
                broken(p, aLine + " counter " + std::to_string(l.mCounter) + " after " + std::to_string(aTop));
            if (l.mPri != x.mLines.front().mPri || (a.mFamily != ENativeFamily::Alos && l.mPri != x.mPriCode))
                broken(p, aLine + " PRI code " + std::to_string(l.mPri));
            if (!validWindow(a.mFamily, l, x.mPriCode))
                broken(p, aLine + " window code " + std::to_string(l.mSwst) + ", slant range " + std::to_string(l.mRange));
            if (a.mFamily == ENativeFamily::Asar && l.mSource >= 0 &&
                (l.mOffset + l.mLength > theFileSize || l.mLength < a.mLayout.mSamplesPos || l.mSamples > static_cast<uint32_t>(x.mSamples)))
                broken(p, aLine + ": a packet of " + std::to_string(l.mLength) + " bytes at byte " + std::to_string(l.mOffset) + " of " +
                              std::to_string(l.mSamples) + " samples, the file " + std::to_string(theFileSize) + " bytes");
            aTop = std::max(aTop, l.mCounter);
        }
        if (x.mPulses != aTop) broken(p, std::to_string(x.mPulses) + " pulses, last counter " + std::to_string(aTop));
    }
}

/// The header's radar values, times, ranges, centre and orbit: what the chain computes with.
void checkDescription(const CProductDescription& d, std::size_t p)
{
    const std::string aOf = "description of product " + std::to_string(p) + ": ";
    for (const double v : {d.mStartTime, d.mStopTime, d.mFirstDelay, d.mNearRange, d.mCentreRange, d.mFarRange, d.mSceneRange,
                           d.mCentreLatitude, d.mCentreLongitude, d.mIncidenceDeg, d.mProcessingVelocity, d.mAzimuthSpacing,
                           d.mChirpRate})
        if (!std::isfinite(v)) fault(aOf + "a time, range, rate or velocity is not finite");
    for (const double v : {d.mCarrier, d.mSamplingRate, d.mPulseLength, d.mBandwidth, d.mPrf})
        if (!(v > 0.0 && std::isfinite(v))) fault(aOf + "a carrier, sampling rate, pulse, bandwidth or PRF of " + std::to_string(v));
    if (d.mSamples < 1) fault(aOf + std::to_string(d.mSamples) + " samples");
    if (d.mStopTime < d.mStartTime) fault(aOf + "stops before it starts");
    // The chain fits a polynomial of degree 4 to the header's vectors.
    if (d.mStateVectors.size() < 5) fault(aOf + "fewer than 5 state vectors");
    for (const CStateVector& v : d.mStateVectors)
        if (!std::isfinite(v.mTime) || !std::isfinite(v.mPosition[0]) || !std::isfinite(v.mVelocity[0]))
            fault(aOf + "a state vector is not finite");
}

}  // namespace

void importShortOfWriting(const fs::path& theInput, const CNativeOutsideFiles& theOutside, uint8_t theFirst, uint8_t theCount)
{
    for (const CNativeArchive& a : fqorvReadNativeArchives(theInput, theOutside)) {
        checkLayout(a);
        CNativeRecordFile aFile(a.mLayout);
        const std::vector<CRecordCodes> aCodes = aFile.scan();
        if (aCodes.size() != a.mLayout.mRecords) fault("the scan returns another count of records than the layout's");
        std::error_code e;
        const uint64_t aFileSize = fs::file_size(a.mLayout.mDataFile, e);
        CLinePlan aPlan = fqorvPlanLines(aCodes, a);
        const auto n = static_cast<int64_t>(aCodes.size());
        checkPlan(a, aPlan, n, aFileSize, "planned");
        if (theCount > 0) {
            aPlan = fqorvCutPlan(aPlan, theFirst % (n + 1), theCount);
            checkPlan(a, aPlan, n, aFileSize, "cut");
        }
        const std::string aPolarisation = a.mFamily == ENativeFamily::Ers ? std::string() : a.mPolarisation;
        for (std::size_t p = 0; p < aPlan.mProducts.size(); ++p) {
            const CProductDescription d = fqorvDescribeProduct(a, aPlan.mProducts[p], {}, "");
            checkDescription(d, p);
            if (fqorvProductName(a.mSensor, a.mReferenceDay, d.mStartTime, a.mOrbit, aPolarisation).empty()) fault("an empty product name");
        }
    }
}

void runImport(const std::function<void()>& theImport)
{
    try {
        theImport();
    } catch (const CImportFailure& e) {
        // The intended end of a bad archive; QORVEX_FUZZ_VERBOSE shows why (to check the seeds).
        static const bool aVerbose = std::getenv("QORVEX_FUZZ_VERBOSE") != nullptr;
        if (aVerbose) std::fprintf(stderr, "refused: %d %s\n", e.id(), e.parameter());
    } catch (const CErrorExceptionManager& e) {
        fault("a failure id " + std::to_string(e.mId) + " outside the import's failures");
    } catch (const std::exception& e) {
        fault(std::string("an exception outside the import's failures: ") + e.what());
    }
}

}  // namespace qfuzz
