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
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "fuzz_import_support.h"
#include "fuzz_support.h"
#include "qorv_ceos_records.h"
#include "qorv_date.h"
#include "qorv_sim_native.h"

namespace {

namespace fs = std::filesystem;
using qfuzz::Bytes;

constexpr std::size_t ENVISAT_HEADERS = NQORV_SIM_ENVISAT::DATA_OFFSET;
constexpr std::size_t ENVISAT_KEPT = NQORV_SIM_ENVISAT::SAMPLES_POS;
constexpr std::size_t CEOS_DESCRIPTOR_KEPT = 448;   // the descriptor's fields end at byte 432
constexpr std::size_t CEOS_RECORD_KEPT = 256;       // a line's codes end by byte 222 in every layout
constexpr std::size_t MAX_RECORDS = 256;
constexpr int FIXED_LINES = 40;

// ------------------------------------------------------------------------------------------------
// The fixed archives

/// An ERS-2 product of FIXED_LINES lines at 09:52:40 on 12 June 1997, its clock's reference 1500 s
/// before.
struct CFixedScene {
    long mDay = fqorvDaysFromCivil(1997, 6, 12);
    double mStart = 35560.0;
    int mPri = 2820;
    double mPrf = 1.0 / ((mPri + NQORV_ERS::PRI_OFFSET) * NQORV_ERS::PRI_UNIT);
    qfuzz::CFixedOrbit mOrbit{mStart};

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
        for (int k = aCeos ? -1 : 0; k < (aCeos ? 4 : 1); ++k) p.mStateVectors.push_back(mOrbit.vectorAt(mStart + k));

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

/// An ENVISAT-format file in the input's form: its headers and the bytes before each record's samples.
Bytes compactEnvisat(const Bytes& theFile)
{
    Bytes aOut(theFile.begin(), theFile.begin() + ENVISAT_HEADERS);
    for (std::size_t o = ENVISAT_HEADERS; o + NQORV_SIM_ENVISAT::RECORD_SIZE <= theFile.size(); o += NQORV_SIM_ENVISAT::RECORD_SIZE)
        aOut.insert(aOut.end(), theFile.begin() + static_cast<long>(o), theFile.begin() + static_cast<long>(o + ENVISAT_KEPT));
    return aOut;
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
    const Bytes aE2 = compactEnvisat(qfuzz::readAll(aScene.write(CSimNativeFormat::Envisat, {}, aDir / "fixed" / "scene.E2")));
    const Bytes aLeader = qfuzz::compactCeos(qfuzz::readAll(aCeos / "LEA_01.001"), 3, qfuzz::CEOS_MAX_RECORD, qfuzz::CEOS_MAX_RECORD);
    const Bytes aData = qfuzz::compactCeos(qfuzz::readAll(aCeos / "DAT_01.001"), MAX_RECORDS + 1, CEOS_DESCRIPTOR_KEPT, CEOS_RECORD_KEPT);
    const fs::path aAsf = aScene.write(CSimNativeFormat::Ceos, CSimCeosLayout::Asf, aDir / "fixed" / "asf");
    const Bytes aAsfData = qfuzz::compactCeos(qfuzz::readAll(aAsf / "DAT_01.001"), MAX_RECORDS + 1, CEOS_DESCRIPTOR_KEPT, CEOS_RECORD_KEPT);
    qfuzz::writeSeed(aSeeds, "seed-envisat", {0, 0, 0}, aE2);
    qfuzz::writeSeed(aSeeds, "seed-envisat-cut", {0, 5, 20}, aE2);
    qfuzz::writeSeed(aSeeds, "seed-ceos-leader", {1, 0, 0}, aLeader);
    qfuzz::writeSeed(aSeeds, "seed-ceos-leader-cut", {1, 14, 25}, aLeader);
    qfuzz::writeSeed(aSeeds, "seed-ceos-data", {2, 0, 0}, aData);
    qfuzz::writeSeed(aSeeds, "seed-ceos-data-asf-cut", {2, 3, 30}, aAsfData);
    return p;
}

// ------------------------------------------------------------------------------------------------
// An input into its file

void writeEnvisat(const fs::path& thePath, const uint8_t* d, std::size_t n)
{
    qfuzz::CSparseFile f(thePath);
    const std::size_t aHead = std::min(n, ENVISAT_HEADERS);
    f.put(0, d, aHead);
    for (std::size_t i = aHead, k = 0; i < n && k < MAX_RECORDS; i += ENVISAT_KEPT, ++k) {
        const uint64_t o = ENVISAT_HEADERS + k * static_cast<uint64_t>(NQORV_SIM_ENVISAT::RECORD_SIZE);
        const std::size_t aTake = std::min(ENVISAT_KEPT, n - i);
        f.put(o, d + i, aTake);
        if (aTake == ENVISAT_KEPT) f.end(o + NQORV_SIM_ENVISAT::RECORD_SIZE);
    }
}

CPaths gPaths;

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
        qfuzz::CSparseFile(aInput = gPaths.mLeaderBeside).put(0, d, n);
        break;
    default:
        qfuzz::writeCeosRecords(aInput = gPaths.mDataBeside, d, n, CEOS_DESCRIPTOR_KEPT, CEOS_RECORD_KEPT, MAX_RECORDS + 1);
        break;
    }
    qfuzz::runImport([&] { qfuzz::importShortOfWriting(aInput, {}, theData[1], theData[2]); });
    return 0;
}
