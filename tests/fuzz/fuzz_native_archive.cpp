// The import of native ERS raw archives short of writing: recognition and the readers of both
// formats, the scan of the line records, the line plan and its cut to a stretch, the product names
// and the description of each product. A CImportFailure ends a bad input; anything else is a fault,
// and so is a plan or a description that breaks what the chain relies on.
//
// Input: byte 0 picks the file the rest becomes (modulo 3): 0 an ENVISAT-format file, 1 a CEOS
// leader beside a fixed valid data file, 2 a CEOS data file beside a fixed valid leader. Bytes 1
// and 2 give the stretch: record byte 1 (modulo the records + 1) on, byte 2 records (0: no cut).
//
// Line records are some 11.5 kB, mostly samples that nothing here reads, and a product needs 32
// lines: the input holds only the bytes before each record's samples, and the harness writes them
// into a sparse file at the record's place (the samples read as zeros). ENVISAT format: the first
// 3203 bytes are the headers, then 266 bytes per record of 11498. CEOS data file: each record
// by its own length field, of which the input holds the first 448 bytes (descriptor) or 256 bytes
// (line records); a length below 12 or above 64 kB ends the expansion and the rest is written as
// it is. The leader is taken as it is. At most 256 line records are written.
//
// With QORVEX_FUZZ_SEEDS naming a directory, the start-up writes the seeds there: the fixed
// archives (simulated, 40 lines with a counter wrap, a lost line, a repeated record, a window
// shift, a garbled PRI code and a record without its marker) in this input form.
#include <fcntl.h>
#include <unistd.h>

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "fuzz_support.h"
#include "qorv_ceos_records.h"
#include "qorv_date.h"
#include "qorv_errors.h"
#include "qorv_import.h"
#include "qorv_import_failure.h"
#include "qorv_line_plan.h"
#include "qorv_native_reader.h"
#include "qorv_product_description.h"
#include "qorv_sim_native.h"
#include "qorv_sim_orbit.h"

namespace {

namespace fs = std::filesystem;
using Bytes = std::vector<uint8_t>;

constexpr std::size_t ENVISAT_HEADERS = NQORV_SIM_ENVISAT::DATA_OFFSET;
constexpr std::size_t ENVISAT_KEPT = NQORV_SIM_ENVISAT::SAMPLES_POS;
constexpr std::size_t CEOS_DESCRIPTOR_KEPT = 448;   // the descriptor's fields end at byte 432
constexpr std::size_t CEOS_RECORD_KEPT = 256;       // a line's codes end by byte 222 in every layout
constexpr uint32_t CEOS_MAX_RECORD = 1u << 16;
constexpr std::size_t MAX_RECORDS = 256;
constexpr int FIXED_LINES = 40;

[[noreturn]] void fault(const std::string& theWhat)
{
    std::fprintf(stderr, "fuzz_native_archive: %s\n", theWhat.c_str());
    std::abort();
}

// ------------------------------------------------------------------------------------------------
// The fixed archives

/// An ERS-2 product of FIXED_LINES lines at 09:52:40 on 12 June 1997, its clock's reference 1500 s
/// before, on a Kepler orbit at 30 degrees of argument of latitude.
struct CFixedScene {
    long mDay = fqorvDaysFromCivil(1997, 6, 12);
    double mStart = 35560.0;
    int mPri = 2820;
    double mPrf = 1.0 / ((mPri + NQORV_ERS::PRI_OFFSET) * NQORV_ERS::PRI_UNIT);
    CSimKepler mElements;

    CFixedScene() { mElements.mM0 = CSimKeplerOrbit::meanAnomalyForArgumentOfLatitude(mElements, 30.0 * CQORV_SIM_DEG); }

    CStateVector vectorAt(double theTime) const
    {
        return fqorvSimStateVector(CSimKeplerOrbit(mElements).state(theTime - mStart), theTime);
    }

    fs::path write(CSimNativeFormat theFormat, CSimCeosLayout theLayout, const fs::path& thePath) const
    {
        const bool aCeos = theFormat == CSimNativeFormat::Ceos;
        CSimNativeProduct p;
        p.mLayout = theLayout;
        p.mOrbit = 11214;
        p.mReferenceDay = mDay;
        if (aCeos) {
            p.mWavelength = 0.0565646;
            p.mChirpRate = NQORV_ERS::CHIRP_RATE;
            p.mSamplingRate = NQORV_ERS::SAMPLING_RATE;
            p.mPulseLength = NQORV_ERS::PULSE_LENGTH;
            p.mPrf = mPrf;
            p.mIBias = p.mQBias = NQORV_ERS::IQ_BIAS;
            p.mCentreTime = std::round((mStart + 0.5 * FIXED_LINES / mPrf) * 1e3) / 1e3;
        }
        p.mClock.mReferenceTime = mStart - 1500.0;
        p.mClock.mReferenceTicks = 2000000000u;
        for (int k = aCeos ? -1 : 0; k < (aCeos ? 4 : 1); ++k) p.mStateVectors.push_back(vectorAt(mStart + k));

        const auto aWriter = fqorvSimOpenNativeWriter(theFormat, p, thePath);
        const Bytes aSamples(2 * static_cast<std::size_t>(p.mSamples), 15);   // 5616: whole records (a CEOS suffix has 4 digits)
        long aPulse = 0;
        for (int k = 0; k < FIXED_LINES; ++k) {
            if (k == 12) ++aPulse;   // a lost line
            if (k == 20) --aPulse;   // a repeated record
            CSimNativeLine l;
            l.mCounter = (0xFFFFF0u + static_cast<uint32_t>(aPulse)) & 0xFFFFFFu;   // wraps at pulse 16
            l.mClock = fqorvSimClockTicks(p.mClock, mStart + static_cast<double>(aPulse - aPulse % 4) / mPrf);
            l.mSwst = static_cast<uint16_t>(k < 24 ? 900 : 922);
            l.mPri = static_cast<uint16_t>(k == 28 ? 3000 : mPri);
            if (k == 33) l.mMarker = 0;
            l.mPacketCounter = static_cast<uint8_t>(aPulse);
            l.mRecordNumber = static_cast<uint32_t>(k + 1);
            aWriter->writeLine(l, aSamples.data());
            ++aPulse;
        }
        return aWriter->finish();
    }
};

Bytes readAll(const fs::path& thePath)
{
    std::ifstream aIn(thePath, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(aIn), std::istreambuf_iterator<char>());
}

uint32_t ceosLength(const uint8_t* theRecord) { return fqorvBigEndianU32(theRecord + 8); }

/// An ENVISAT-format file in the input's form: its headers and the bytes before each record's samples.
Bytes compactEnvisat(const Bytes& theFile)
{
    Bytes aOut(theFile.begin(), theFile.begin() + ENVISAT_HEADERS);
    for (std::size_t o = ENVISAT_HEADERS; o + NQORV_SIM_ENVISAT::RECORD_SIZE <= theFile.size(); o += NQORV_SIM_ENVISAT::RECORD_SIZE)
        aOut.insert(aOut.end(), theFile.begin() + o, theFile.begin() + o + ENVISAT_KEPT);
    return aOut;
}

/// A CEOS file in the input's form: the first bytes of each record (theRecords of them at most).
Bytes compactCeos(const Bytes& theFile, std::size_t theRecords, std::size_t theFirstKept, std::size_t theKept)
{
    Bytes aOut;
    for (std::size_t o = 0, k = 0; k < theRecords && o + CQORV_CEOS_HEADER_BYTES <= theFile.size(); ++k) {
        const std::size_t aLength = ceosLength(theFile.data() + o);
        const std::size_t aTake = std::min(aLength, k == 0 ? theFirstKept : theKept);
        aOut.insert(aOut.end(), theFile.begin() + o, theFile.begin() + o + aTake);
        o += aLength;
    }
    return aOut;
}

void writeSeed(const fs::path& theDir, const std::string& theName, uint8_t theKind, uint8_t theFirst, uint8_t theCount,
               const Bytes& theFile)
{
    Bytes aSeed{theKind, theFirst, theCount};
    aSeed.insert(aSeed.end(), theFile.begin(), theFile.end());
    const fs::path aPart = theDir / (theName + ".part");
    std::ofstream(aPart, std::ios::binary).write(reinterpret_cast<const char*>(aSeed.data()), static_cast<std::streamsize>(aSeed.size()));
    fs::rename(aPart, theDir / theName);   // whole, whichever worker wrote it
}

struct CPaths {
    fs::path mEnvisat, mLeaderBeside, mDataBeside;   // where each kind of input is written
};

/// Writes the fixed archives, puts each partner beside the input it goes with, and the seeds
/// into theSeeds when given.
CPaths prepare(const char* theSeeds)
{
    const fs::path aDir = qfuzz::scratchDir();
    const CFixedScene aScene;
    const fs::path aCeos = aScene.write(CSimNativeFormat::Ceos, CSimCeosLayout::PgsVmp, aDir / "fixed" / "ceos");
    CPaths p{aDir / "envisat" / "in.E2", aDir / "leader" / "LEA_01.001", aDir / "data" / "DAT_01.001"};
    for (const fs::path& x : {p.mEnvisat, p.mLeaderBeside, p.mDataBeside}) fs::create_directories(x.parent_path());
    fs::copy_file(aCeos / "DAT_01.001", p.mLeaderBeside.parent_path() / "DAT_01.001", fs::copy_options::overwrite_existing);
    fs::copy_file(aCeos / "LEA_01.001", p.mDataBeside.parent_path() / "LEA_01.001", fs::copy_options::overwrite_existing);
    if (theSeeds == nullptr || *theSeeds == '\0') return p;

    const fs::path aSeeds(theSeeds);
    fs::create_directories(aSeeds);
    const Bytes aE2 = compactEnvisat(readAll(aScene.write(CSimNativeFormat::Envisat, {}, aDir / "fixed" / "scene.E2")));
    const Bytes aLeader = compactCeos(readAll(aCeos / "LEA_01.001"), 3, CEOS_MAX_RECORD, CEOS_MAX_RECORD);
    const Bytes aData = compactCeos(readAll(aCeos / "DAT_01.001"), MAX_RECORDS + 1, CEOS_DESCRIPTOR_KEPT, CEOS_RECORD_KEPT);
    const fs::path aAsf = aScene.write(CSimNativeFormat::Ceos, CSimCeosLayout::Asf, aDir / "fixed" / "asf");
    const Bytes aAsfData = compactCeos(readAll(aAsf / "DAT_01.001"), MAX_RECORDS + 1, CEOS_DESCRIPTOR_KEPT, CEOS_RECORD_KEPT);
    writeSeed(aSeeds, "seed-envisat", 0, 0, 0, aE2);
    writeSeed(aSeeds, "seed-envisat-cut", 0, 5, 20, aE2);
    writeSeed(aSeeds, "seed-ceos-leader", 1, 0, 0, aLeader);
    writeSeed(aSeeds, "seed-ceos-leader-cut", 1, 14, 25, aLeader);
    writeSeed(aSeeds, "seed-ceos-data", 2, 0, 0, aData);
    writeSeed(aSeeds, "seed-ceos-data-asf-cut", 2, 3, 30, aAsfData);
    return p;
}

// ------------------------------------------------------------------------------------------------
// An input into its file

/// A file written piece by piece at given places; what lies between stays a hole.
class CSparseFile {
public:
    explicit CSparseFile(const fs::path& thePath) : mFd(::open(thePath.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600))
    {
        if (mFd < 0) fault("can't write " + thePath.string());
    }
    ~CSparseFile()
    {
        if (::ftruncate(mFd, static_cast<off_t>(mSize)) != 0) fault("can't size the input file");
        ::close(mFd);
    }
    void put(uint64_t theOffset, const uint8_t* theBytes, std::size_t theCount)
    {
        if (theCount > 0 && ::pwrite(mFd, theBytes, theCount, static_cast<off_t>(theOffset)) != static_cast<ssize_t>(theCount))
            fault("can't write the input file");
        end(theOffset + theCount);
    }
    void end(uint64_t theOffset) { mSize = std::max(mSize, theOffset); }

private:
    int mFd;
    uint64_t mSize = 0;
};

void writeEnvisat(const fs::path& thePath, const uint8_t* d, std::size_t n)
{
    CSparseFile f(thePath);
    const std::size_t aHead = std::min(n, ENVISAT_HEADERS);
    f.put(0, d, aHead);
    for (std::size_t i = aHead, k = 0; i < n && k < MAX_RECORDS; i += ENVISAT_KEPT, ++k) {
        const uint64_t o = ENVISAT_HEADERS + k * static_cast<uint64_t>(NQORV_SIM_ENVISAT::RECORD_SIZE);
        const std::size_t aTake = std::min(ENVISAT_KEPT, n - i);
        f.put(o, d + i, aTake);
        if (aTake == ENVISAT_KEPT) f.end(o + NQORV_SIM_ENVISAT::RECORD_SIZE);
    }
}

void writeCeosData(const fs::path& thePath, const uint8_t* d, std::size_t n)
{
    CSparseFile f(thePath);
    uint64_t o = 0;
    for (std::size_t i = 0, k = 0; i < n && k <= MAX_RECORDS; ++k) {
        const uint32_t aLength = n - i >= CQORV_CEOS_HEADER_BYTES ? ceosLength(d + i) : 0;
        if (aLength < CQORV_CEOS_HEADER_BYTES || aLength > CEOS_MAX_RECORD) {
            f.put(o, d + i, n - i);
            return;
        }
        const std::size_t aKept = std::min<std::size_t>(aLength, k == 0 ? CEOS_DESCRIPTOR_KEPT : CEOS_RECORD_KEPT);
        const std::size_t aTake = std::min(aKept, n - i);
        f.put(o, d + i, aTake);
        if (aTake < aKept) return;   // the file ends inside this record
        o += aLength;
        f.end(o);
        i += aTake;
    }
}

// ------------------------------------------------------------------------------------------------
// What the chain relies on

/// Every line comes from a record of the file (or is a fill line); a product's counters start at 1
/// and never step further than the chain follows beyond the highest before; one PRI code and valid
/// window codes; the first pulse time is finite.
void checkPlan(const CLinePlan& thePlan, int64_t theRecords, const char* theWhich)
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
        uint32_t aTop = 0;
        for (std::size_t k = 0; k < x.mLines.size(); ++k) {
            const CPlannedLine& l = x.mLines[k];
            if (l.mSource < -1 || l.mSource >= theRecords) broken(p, "line " + std::to_string(k) + " from record " + std::to_string(l.mSource));
            if (l.mCounter < 1 || l.mCounter > aTop + CQORV_CHAIN_GAP_LIMIT + 1)
                broken(p, "line " + std::to_string(k) + " counter " + std::to_string(l.mCounter) + " after " + std::to_string(aTop));
            if (l.mPri != x.mPriCode) broken(p, "line " + std::to_string(k) + " PRI code " + std::to_string(l.mPri));
            if (l.mSwst < NQORV_ERS::SWST_MIN || l.mSwst > NQORV_ERS::SWST_MAX)
                broken(p, "line " + std::to_string(k) + " SWST code " + std::to_string(l.mSwst));
            aTop = std::max(aTop, l.mCounter);
        }
        if (x.mPulses != aTop) broken(p, std::to_string(x.mPulses) + " pulses, last counter " + std::to_string(aTop));
    }
}

void checkDescription(const CProductDescription& d, std::size_t p)
{
    for (const double v : {d.mStartTime, d.mStopTime, d.mFirstDelay, d.mNearRange, d.mCentreRange, d.mFarRange, d.mSceneRange,
                           d.mCentreLatitude, d.mCentreLongitude, d.mIncidenceDeg, d.mProcessingVelocity, d.mAzimuthSpacing})
        if (!std::isfinite(v)) fault("description of product " + std::to_string(p) + ": a time, range or velocity is not finite");
    if (d.mStopTime < d.mStartTime) fault("description of product " + std::to_string(p) + ": stops before it starts");
    // The chain fits a polynomial of degree 4 to the header's vectors.
    if (d.mStateVectors.size() < 5) fault("description of product " + std::to_string(p) + ": fewer than 5 state vectors");
    for (const CStateVector& v : d.mStateVectors)
        if (!std::isfinite(v.mTime) || !std::isfinite(v.mPosition[0]) || !std::isfinite(v.mVelocity[0]))
            fault("description of product " + std::to_string(p) + ": a state vector is not finite");
}

CPaths gPaths;

/// What an import does with its input short of writing.
void importOne(const fs::path& theInput, uint8_t theFirst, uint8_t theCount)
{
    const CNativeArchive a = fqorvReadNativeArchive(theInput);
    // The writer copies each line's samples out of its record.
    const CNativeRecordLayout& l = a.mLayout;
    if (l.mSamples < 1 || l.mSamplesPos + 2 * static_cast<uint64_t>(l.mSamples) > l.mRecordLength)
        fault(std::to_string(l.mSamples) + " samples from byte " + std::to_string(l.mSamplesPos) + " of records of " +
              std::to_string(l.mRecordLength) + " bytes");
    CNativeRecordFile aFile(a.mLayout);
    const std::vector<CRecordCodes> aCodes = aFile.scan();
    if (aCodes.size() != a.mLayout.mRecords) fault("the scan returns another count of records than the layout's");
    CLinePlan aPlan = fqorvPlanLines(aCodes, a);
    const auto n = static_cast<int64_t>(aCodes.size());
    checkPlan(aPlan, n, "planned");
    if (theCount > 0) {
        aPlan = fqorvCutPlan(aPlan, theFirst % (n + 1), theCount);
        checkPlan(aPlan, n, "cut");
    }
    for (std::size_t p = 0; p < aPlan.mProducts.size(); ++p) {
        const CProductDescription d = fqorvDescribeProduct(a, aPlan.mProducts[p], {}, "");
        checkDescription(d, p);
        if (fqorvProductName(a.mSensor, a.mReferenceDay, d.mStartTime, a.mOrbit).empty()) fault("an empty product name");
    }
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    qfuzz::setUpRun();
    gPaths = prepare(std::getenv("QORVEX_FUZZ_SEEDS"));
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    if (theSize < 3) return 0;
    const uint8_t* d = theData + 3;
    const std::size_t n = theSize - 3;
    fs::path aInput;
    switch (theData[0] % 3) {
    case 0:
        writeEnvisat(aInput = gPaths.mEnvisat, d, n);
        break;
    case 1:
        CSparseFile(aInput = gPaths.mLeaderBeside).put(0, d, n);
        break;
    default:
        writeCeosData(aInput = gPaths.mDataBeside, d, n);
        break;
    }
    try {
        importOne(aInput, theData[1], theData[2]);
    } catch (const CImportFailure&) {
        // the intended end of a bad archive
    } catch (const CErrorExceptionManager& e) {
        fault("a failure id " + std::to_string(e.mId) + " outside the import's failures");
    } catch (const std::exception& e) {
        fault(std::string("an exception outside the import's failures: ") + e.what());
    }
    return 0;
}
