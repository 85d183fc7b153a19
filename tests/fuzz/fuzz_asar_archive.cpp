// The import of ENVISAT ASAR level 0 products short of writing: the product's headers and packets,
// its instrument file and DORIS orbit (given, or found beside it by their content), the scan of
// the packets, the line plan and its cut, the product names and descriptions. A CImportFailure ends
// a bad input; anything else is a fault, and so is a plan or a description that breaks what the
// chain relies on (fuzz_import_support).
//
// Input: byte 0 picks the file the rest becomes (modulo 3), the other two being the fixed ones:
// 0 the product (.N1), 1 the orbit file, 2 the instrument file, of which the input holds the start
// (headers, radar frequency and sampling rate) and, in its last 60 bytes, the range gate bias and
// the image mode timeline; the FBAQ tables stay the fixed file's. Byte 1, bit 0: the outside files
// are given (1) or found beside the product (0). Bytes 2 and 3 give the stretch: record byte 2
// (modulo the records + 1) on, byte 3 records (0: no cut).
//
// With QORVEX_FUZZ_SEEDS naming a directory, the start-up writes the seeds there: the fixed files
// in this input form, whole and cut, with the outside files given and found.
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "fuzz_import_support.h"
#include "fuzz_support.h"
#include "qorv_date.h"
#include "qorv_sim_asar.h"

namespace {

namespace fs = std::filesystem;
using qfuzz::Bytes;

constexpr std::size_t HEAD = 4;
constexpr std::size_t INSTRUMENT_TAIL = 60;        // range gate bias (4 bytes), timeline (28 u16)
constexpr std::size_t TIMELINE_BYTES = 56;
constexpr int ECHOES = 40;

// ------------------------------------------------------------------------------------------------
// The fixed files

/// An ASAR image mode product of IS2 at 10:00 on 1 March 2004: two noise packets, ECHOES echoes of
/// 63 samples (the last of 126) with a counter wrap, a lost packet, a calibration packet among
/// them and a window shift; its instrument file and a DORIS orbit a minute apart, five minutes
/// beyond the scene.
struct CFixedAsar {
    long mDay = fqorvDaysFromCivil(2004, 3, 1);
    double mStart = 36000.0;
    double mFs = 19207680.0;
    uint16_t mPri = 11028;                         // 1741.7 Hz
    uint16_t mSwst = 7184;                         // with rank 9: a first sample 5.54 ms after its pulse
    qfuzz::CFixedOrbit mOrbit{mStart};
    CSimNativeProduct mProduct;
    CSimAsarValues mValues;

    CFixedAsar()
    {
        CSimNativeProduct& p = mProduct;
        p.mSensor = "ENVISAT-1";
        p.mFacility = "PDHS-E";
        p.mProcessor = "ASAR/3.08";
        p.mOrbit = 10555;
        p.mReferenceDay = mDay;
        p.mClock.mReferenceTime = mStart - 1500.0;
        p.mClock.mReferenceTicks = 2000000000u;
        p.mStateVectors = {mOrbit.vectorAt(mStart + 0.5 * ECHOES * mPri / mFs)};
        CSimAsarValues& v = mValues;
        v.mBeamSet = 2;
        v.mRanks = {8, 9, 10, 11, 12, 13, 14};
        v.mCarrier = 5.331e9;
        v.mSamplingRate = mFs;
        v.mPulseCode = 521;                        // 27.1 us
        v.mBandwidthCode = 255;                    // 16 MHz
        v.mValidityStart = -86400.0;
        v.mValidityStop = 2 * 86400.0;
    }

    fs::path writeProduct(const fs::path& thePath) const
    {
        CSimAsarWriter w(mProduct, mValues, thePath);
        Bytes aBlocks(static_cast<std::size_t>(fqorvSimFbaqBytes(126)));
        for (std::size_t i = 0; i < aBlocks.size(); ++i) aBlocks[i] = static_cast<uint8_t>(i % 64 == 0 ? 128 : i * 37);
        const double aPrf = mFs / mPri;
        const auto packet = [&](uint8_t theFlags, long thePulse, uint16_t theSwst, int theSamples) {
            CSimAsarPacket p;
            p.mFlags = theFlags;
            p.mCount = 0xFFFFF8u + static_cast<uint32_t>(thePulse + 2);   // wraps at pulse 6
            p.mSensingTime = mStart + static_cast<double>(thePulse) / aPrf;
            p.mPri = mPri;
            p.mSwst = theSwst;
            w.writePacket(p, aBlocks.data(), fqorvSimFbaqBytes(theSamples));
        };
        packet(NQORV_SIM_ASAR::NOISE, -2, mSwst, 63);
        packet(NQORV_SIM_ASAR::NOISE, -1, mSwst, 63);
        for (long k = 0, aPulse = 0; k < ECHOES; ++k, ++aPulse) {
            if (k == 12) ++aPulse;   // a lost packet
            if (k == 20) packet(NQORV_SIM_ASAR::CALIBRATION, aPulse++, mSwst, 63);
            packet(NQORV_SIM_ASAR::ECHO, aPulse, static_cast<uint16_t>(k < 24 ? mSwst : mSwst + 10), k + 1 == ECHOES ? 126 : 63);
        }
        return w.finish();
    }

    void writeInstrument(const fs::path& thePath) const
    {
        fqorvSimWriteAsarInstrument(mProduct, mValues, fqorvSimFbaqEncoder().tables(), thePath);
    }

    void writeOrbit(const fs::path& thePath) const
    {
        std::vector<CStateVector> v;
        for (double t = mStart - 360.0; t <= mStart + 360.0; t += 60.0) v.push_back(mOrbit.vectorAt(t));
        fqorvSimWriteDorisOrbit(mProduct, v, thePath);
    }
};

/// Where the fixed instrument file holds what the input's tail replaces.
constexpr std::size_t INSTRUMENT_HEADERS = NQORV_SIM_ENVISAT::MPH_SIZE + NQORV_SIM_ASAR::SMALL_SPH_SIZE;
constexpr std::size_t INSTRUMENT_START = INSTRUMENT_HEADERS + NQORV_SIM_ASAR::INS_SAMPLING_RATE + 4;
constexpr std::size_t BIAS_AT = INSTRUMENT_HEADERS + NQORV_SIM_ASAR::INS_RANGE_GATE_BIAS;
constexpr std::size_t TIMELINE_AT = INSTRUMENT_HEADERS + NQORV_SIM_ASAR::INS_TIMELINE;

/// The three files as the input gives them, the fixed ones and where they are written.
struct CFiles {
    fs::path mPath[3];                             // product, orbit, instrument
    Bytes mFixed[3];
    bool mChanged[3] = {false, false, false};

    /// Writes the file theKind from the input (theData, theSize bytes) at its path; the instrument
    /// file is the fixed one with the input's pieces written over it at their places, the rest
    /// written straight from the fixed bytes (no copy of its 173 kB).
    void writeFromInput(int theKind, const uint8_t* theData, std::size_t theSize) const
    {
        qfuzz::CSparseFile aFile(mPath[theKind]);
        if (theKind < 2) {
            aFile.put(0, theData, theSize);
            return;
        }
        const Bytes& f = mFixed[2];
        const std::size_t aStart = theSize >= INSTRUMENT_TAIL ? theSize - INSTRUMENT_TAIL : theSize;
        const std::size_t aHead = std::min(aStart, f.size());
        aFile.put(0, theData, aHead);
        aFile.put(aHead, f.data() + aHead, f.size() - aHead);
        if (aStart < theSize) {
            aFile.put(BIAS_AT, theData + aStart, 4);
            aFile.put(TIMELINE_AT, theData + aStart + 4, theSize - aStart - 4);
        }
    }

    /// The instrument file in the input's form.
    Bytes compactInstrument() const
    {
        const Bytes& f = mFixed[2];
        Bytes aOut(f.begin(), f.begin() + INSTRUMENT_START);
        aOut.insert(aOut.end(), f.begin() + BIAS_AT, f.begin() + BIAS_AT + 4);
        aOut.insert(aOut.end(), f.begin() + TIMELINE_AT, f.begin() + TIMELINE_AT + TIMELINE_BYTES);
        return aOut;
    }
};

CFiles gFiles;

void prepare(const char* theSeeds)
{
    const fs::path aDir = fs::path(qfuzz::scratchDir()) / "asar";
    fs::create_directories(aDir);
    const CFixedAsar aScene;
    gFiles.mPath[0] = aScene.writeProduct(aDir / "product.N1");
    aScene.writeOrbit(gFiles.mPath[1] = aDir / "orbit_DOR_VOR_AX");
    aScene.writeInstrument(gFiles.mPath[2] = aDir / "instrument_ASA_INS_AX");
    for (int k = 0; k < 3; ++k) gFiles.mFixed[k] = qfuzz::readAll(gFiles.mPath[k]);
    if (theSeeds == nullptr || *theSeeds == '\0') return;

    const fs::path aSeeds(theSeeds);
    fs::create_directories(aSeeds);
    qfuzz::writeSeed(aSeeds, "seed-asar-product", {0, 1, 0, 0}, gFiles.mFixed[0]);
    qfuzz::writeSeed(aSeeds, "seed-asar-product-beside", {0, 0, 0, 0}, gFiles.mFixed[0]);
    qfuzz::writeSeed(aSeeds, "seed-asar-product-cut", {0, 1, 4, 36}, gFiles.mFixed[0]);
    qfuzz::writeSeed(aSeeds, "seed-asar-orbit", {1, 1, 0, 0}, gFiles.mFixed[1]);
    qfuzz::writeSeed(aSeeds, "seed-asar-orbit-beside", {1, 0, 0, 0}, gFiles.mFixed[1]);
    qfuzz::writeSeed(aSeeds, "seed-asar-instrument", {2, 1, 0, 0}, gFiles.compactInstrument());
    qfuzz::writeSeed(aSeeds, "seed-asar-instrument-beside", {2, 0, 0, 0}, gFiles.compactInstrument());
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    qfuzz::setUpRun();
    prepare(std::getenv("QORVEX_FUZZ_SEEDS"));
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    if (theSize < HEAD) return 0;
    const int aKind = theData[0] % 3;
    for (int k = 0; k < 3; ++k) {
        if (k != aKind && !gFiles.mChanged[k]) continue;
        if (k == aKind)
            gFiles.writeFromInput(k, theData + HEAD, theSize - HEAD);
        else
            qfuzz::CSparseFile(gFiles.mPath[k]).put(0, gFiles.mFixed[k].data(), gFiles.mFixed[k].size());
        gFiles.mChanged[k] = k == aKind;
    }
    CNativeOutsideFiles aOutside;
    if (theData[1] & 1) aOutside = {gFiles.mPath[2], gFiles.mPath[1]};
    qfuzz::runImport([&] { qfuzz::importShortOfWriting(gFiles.mPath[0], aOutside, theData[2], theData[3]); });
    return 0;
}
