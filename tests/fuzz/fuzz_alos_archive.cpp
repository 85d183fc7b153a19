// The import of ALOS PALSAR level 1.0 products short of writing: the leader's summary, platform
// position and calibration records, the image file's descriptor and signal records, the scan, the
// line plan (with the leader's PRF switch) and its cut, the product names and descriptions. A
// CImportFailure ends a bad input; anything else is a fault, and so is a plan or a description
// that breaks what the chain relies on (fuzz_import_support).
//
// Input: byte 0 picks the file the rest becomes (modulo 2): 0 the leader beside a fixed image
// file, 1 the image file beside a fixed leader. Bytes 1 and 2 give the stretch: record byte 1
// (modulo the records + 1) on, byte 2 records (0: no cut). The leader is taken as it is; of the
// image file the input holds the whole descriptor and the first 128 bytes of each signal record
// (the codes end at byte 120), written at the record's place by its own length field (the samples
// read as zeros; a length below 12 or above 64 kB ends this and the rest is written as it is).
//
// With QORVEX_FUZZ_SEEDS naming a directory, the start-up writes the seeds there: both files of
// the fixed product in this input form, whole and cut.
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "fuzz_import_support.h"
#include "fuzz_support.h"
#include "qorv_date.h"
#include "qorv_sim_alos.h"

namespace {

namespace fs = std::filesystem;
using qfuzz::Bytes;

constexpr std::size_t HEAD = 3;
constexpr std::size_t DESCRIPTOR_KEPT = 720;
constexpr std::size_t RECORD_KEPT = 128;
constexpr std::size_t MAX_RECORDS = 256;
constexpr int LINES = 50;

/// An FBS product of LINES lines of 16 samples at 01:30 on 12 August 2007: a lost line, a repeated
/// record, a slant range that moves, a garbled PRF, and a PRF switch, which the leader states, ten
/// lines before the end (a product too short to keep).
fs::path writeFixedProduct(const fs::path& theDirectory)
{
    const double aStart = 5400.0;
    const qfuzz::CFixedOrbit aOrbit(aStart);
    CSimAlosProduct p;
    p.mSceneId = "ALPSRP081234560-H1.0__A";
    p.mReferenceDay = fqorvDaysFromCivil(2007, 8, 12);
    p.mSamples = 16;
    p.mRightFill = 8;
    p.mOrbit = 8123;
    p.mWavelength = 299792458.0 / 1.27e9;
    p.mSamplingRate = 32e6;
    p.mPulseLength = 27e-6;
    p.mBandwidth = 28e6;
    p.mPrf = 2159.827;
    const double aSecondPrf = 2145.923;
    p.mPrfSwitchLine = 41;
    p.mCentreTime = std::round((aStart + 0.5 * LINES / p.mPrf) * 1e3) / 1e3;
    p.mCentreLatitude = 35.1;
    p.mCentreLongitude = 139.4;
    p.mIncidenceDeg = 34.3;
    for (double t = aStart - 120.0; t <= aStart + 180.0; t += 60.0) p.mStateVectors.push_back(aOrbit.vectorAt(t));

    CSimAlosWriter w(p, theDirectory);
    const Bytes aSamples(2 * static_cast<std::size_t>(p.mSamples), 15);
    double t = aStart;
    for (uint32_t k = 0, aLine = 1; k < LINES; ++k, ++aLine) {
        if (k == 12) ++aLine;   // a lost line
        if (k == 20) --aLine;   // a repeated record
        const double aPrf = aLine >= static_cast<uint32_t>(p.mPrfSwitchLine) ? aSecondPrf : p.mPrf;
        const auto aStated = static_cast<uint32_t>(k == 30 ? 9999 : std::llround(aPrf * 1000.0));
        w.writeLine({aLine, t, aStated, k < 24 ? 850000 : 850030}, aSamples.data());
        t += 1.0 / aPrf;
    }
    return w.finish();
}

struct CPaths {
    fs::path mLeader, mImage;                      // the input's file, its partner fixed beside it
};
CPaths gLeaderInput, gImageInput;

void prepare(const char* theSeeds)
{
    const fs::path aDir = fs::path(qfuzz::scratchDir()) / "alos";
    const fs::path aFixed = writeFixedProduct(aDir / "fixed");
    CSimAlosProduct n;
    n.mSceneId = "ALPSRP081234560-H1.0__A";
    const std::string aLeader = CSimAlosWriter::leaderName(n), aImage = CSimAlosWriter::imageName(n, "HH");
    gLeaderInput = {aDir / "leader" / aLeader, aDir / "leader" / aImage};
    gImageInput = {aDir / "image" / aLeader, aDir / "image" / aImage};
    for (const CPaths& p : {gLeaderInput, gImageInput}) fs::create_directories(p.mLeader.parent_path());
    fs::copy_file(aFixed / aImage, gLeaderInput.mImage, fs::copy_options::overwrite_existing);
    fs::copy_file(aFixed / aLeader, gImageInput.mLeader, fs::copy_options::overwrite_existing);
    if (theSeeds == nullptr || *theSeeds == '\0') return;

    const fs::path aSeeds(theSeeds);
    fs::create_directories(aSeeds);
    const Bytes aLeaderBytes = qfuzz::readAll(aFixed / aLeader);
    const Bytes aImageBytes = qfuzz::compactCeos(qfuzz::readAll(aFixed / aImage), MAX_RECORDS + 1, DESCRIPTOR_KEPT, RECORD_KEPT);
    qfuzz::writeSeed(aSeeds, "seed-alos-leader", {0, 0, 0}, aLeaderBytes);
    qfuzz::writeSeed(aSeeds, "seed-alos-leader-cut", {0, 2, 34}, aLeaderBytes);
    qfuzz::writeSeed(aSeeds, "seed-alos-image", {1, 0, 0}, aImageBytes);
    qfuzz::writeSeed(aSeeds, "seed-alos-image-cut", {1, 5, 33}, aImageBytes);
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
    const uint8_t* d = theData + HEAD;
    const std::size_t n = theSize - HEAD;
    fs::path aInput;
    if (theData[0] % 2 == 0)
        qfuzz::CSparseFile(aInput = gLeaderInput.mLeader).put(0, d, n);
    else
        qfuzz::writeCeosRecords(aInput = gImageInput.mImage, d, n, DESCRIPTOR_KEPT, RECORD_KEPT, MAX_RECORDS + 1);
    qfuzz::runImport([&] { qfuzz::importShortOfWriting(aInput, {}, theData[1], theData[2]); });
    return 0;
}
