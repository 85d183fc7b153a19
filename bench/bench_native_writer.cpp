// Raw products written from native data sets against cp of the written product's bytes in the same
// run: a full ENVISAT ASAR image mode frame (30,000 echo packets of 6656 samples, a noise packet
// every 1000: the packets read, FBAQ-decoded into big-endian floats and written) and a full ALOS
// PALSAR FBS frame (18,000 records of 10,304 samples and 80 bytes of right-fill: the records read
// into their lines). Best
// of five runs each, in turn, each started after a sync, the data set warm in the page cache;
// prints both and their ratio.
//
//   build/bin/bench_native_writer [threads]       (scratch files under $TMPDIR, about 3.5 GB)
#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <random>
#include <unistd.h>
#include <string>
#include <vector>

#include "qorv_date.h"
#include "qorv_generic_utility.h"
#include "qorv_line_plan.h"
#include "qorv_native_reader.h"
#include "qorv_product_description.h"
#include "qorv_raw_product_writer.h"
#include "qorv_sim_native.h"
#include "qorv_sim_orbit.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

constexpr int CQORV_PACKETS = 30300;
constexpr double CQORV_FS = 19.20768e6;
constexpr int CQORV_PRI = 11028;
constexpr uint32_t CQORV_PACKET_BYTES = 68 + 6762;   // 6656 samples
constexpr double CQORV_START = 35560.0;

/// The wall time of theRun, started with no dirty pages left by earlier runs.
double seconds(const std::function<void()>& theRun)
{
    ::sync();
    const auto t0 = std::chrono::steady_clock::now();
    theRun();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
}

/// Writes theProduct of theArchive five times and copies it as often, in turn; prints the best
/// of each and their ratio.
void compare(const char* theName, const CNativeArchive& theArchive, const CPlannedProduct& theProduct, const fs::path& theDir)
{
    const CProductDescription d = fqorvDescribeProduct(theArchive, theProduct, {}, "");
    CNativeRecordFile aRecords(theArchive.mLayout);
    const fs::path aRaw = theDir / "frame_raw";
    std::system(("cat " + theArchive.mLayout.mDataFile.string() + " > /dev/null").c_str());
    // The machine's other work and its writing back of earlier runs' pages weigh on both alike.
    const std::string aCp = "cp " + aRaw.string() + " " + (theDir / "copy").string();
    double aWrite = 1e30, aCopy = 1e30, aBytes = 0.0;
    for (int r = 0; r < 5; ++r) {
        fs::remove(aRaw);
        aWrite = std::min(aWrite, seconds([&] { fqorvWriteRawProduct(theArchive, aRecords, theProduct, d, aRaw); }));
        aBytes = static_cast<double>(fs::file_size(aRaw));
        fs::remove(theDir / "copy");
        aCopy = std::min(aCopy, seconds([&] {
                             if (std::system(aCp.c_str()) != 0) std::abort();
                         }));
    }
    std::printf("%s: %zu lines, %.0f MB written: writer %.3f s, cp %.3f s, ratio %.2f (%d threads)\n", theName,
                theProduct.mLines.size(), aBytes / 1048576.0, aWrite, aCopy, aWrite / aCopy, fqorvThreadCount());
    fs::remove(aRaw);
    fs::remove(theDir / "copy");
    fs::remove(theArchive.mLayout.mDataFile);
}

CNativeArchive archive(ENativeFamily theFamily, const fs::path& theData)
{
    CNativeArchive a;
    a.mFamily = a.mLayout.mFamily = theFamily;
    a.mReferenceDay = fqorvDaysFromCivil(2008, 6, 12);
    a.mLayout.mDataFile = theData;
    CSimKepler k;
    k.mM0 = CSimKeplerOrbit::meanAnomalyForArgumentOfLatitude(k, 30.0 * CQORV_SIM_DEG);
    for (int i = -2; i <= 10; ++i)
        a.mStateVectors.push_back(fqorvSimStateVector(CSimKeplerOrbit(k).state(10.0 * i), CQORV_START + 10.0 * i));
    return a;
}

void benchAsar(const fs::path& theDir)
{
    CNativeArchive a = archive(ENativeFamily::Asar, theDir / "frame.N1");
    a.mSensor = "ENVISAT-1";
    a.mCarrier = 5.331e9;
    a.mSamplingRate = CQORV_FS;
    a.mPulseLength = 27.1e-6;
    a.mBandwidth = 16e6;
    a.mRank = 10;
    a.mRangeGateBias = 1.2e-6;
    a.mClock = {0.0, 0, 1e-6, false, 0};
    a.mLayout.mSamplesPos = 68;
    std::mt19937 aRandom(7);
    std::normal_distribution<float> aLevel(0.0f, 1.0f);
    for (int i = 0; i < 4096; ++i) {
        a.mFbaq.mI.push_back(aLevel(aRandom));
        a.mFbaq.mQ.push_back(aLevel(aRandom));
    }
    // The data set: packets back to back, random FBAQ bytes.
    std::vector<CRecordCodes> aCodes;
    {
        std::ofstream aFile(a.mLayout.mDataFile, std::ios::binary);
        std::vector<char> aPacket(CQORV_PACKET_BYTES);
        for (int p = 0; p < CQORV_PACKETS; ++p) {
            CRecordCodes c;
            c.mMarker = true;
            c.mEcho = p % 1000 != 999;
            c.mCounter = static_cast<uint32_t>(p);
            c.mClock = static_cast<int64_t>(std::floor((CQORV_START + p * CQORV_PRI / CQORV_FS) * 1e6));
            c.mSwst = 6000;
            c.mPri = CQORV_PRI;
            c.mOffset = static_cast<uint64_t>(p) * CQORV_PACKET_BYTES;
            c.mLength = CQORV_PACKET_BYTES;
            aCodes.push_back(c);
            for (char& b : aPacket) b = static_cast<char>(aRandom());
            aFile.write(aPacket.data(), static_cast<std::streamsize>(aPacket.size()));
        }
    }
    compare("ASAR frame", a, fqorvPlanLines(aCodes, a).mProducts.front(), theDir);
}

void benchAlos(const fs::path& theDir)
{
    constexpr int aRecords = 18000, aPixels = 10304, aFill = 80;
    constexpr uint32_t aPrf = 2159827;
    CNativeArchive a = archive(ENativeFamily::Alos, theDir / "IMG-HH-frame");
    a.mSensor = "ALOS_PALSAR";
    a.mWavelength = 0.236057;
    a.mSamplingRate = 32e6;
    a.mPulseLength = 27e-6;
    a.mBandwidth = 28e6;
    a.mOriginData = "ALOS_PALSAR_FBS10";
    a.mClock = {0.0, 0, 1e-3, false, 0};
    a.mLayout.mFirstRecord = 720;
    a.mLayout.mSamplesPos = 412;
    a.mLayout.mSamples = aPixels;
    a.mLayout.mRecordLength = 412 + 2 * aPixels + aFill;
    std::vector<CRecordCodes> aCodes;
    {
        std::ofstream aFile(a.mLayout.mDataFile, std::ios::binary);
        std::vector<char> aRecord(a.mLayout.mRecordLength, 15);
        aFile.write(aRecord.data(), 720);
        for (int r = 0; r < aRecords; ++r) {
            CRecordCodes c;
            c.mMarker = true;
            c.mCounter = static_cast<uint32_t>(r + 1);
            c.mClock = static_cast<int64_t>(std::floor((CQORV_START + r / (aPrf * 1e-3)) * 1e3));
            c.mPrfMilliHz = aPrf;
            c.mRange = 850000;
            aCodes.push_back(c);
            aFile.write(aRecord.data(), static_cast<std::streamsize>(aRecord.size()));
        }
    }
    compare("ALOS frame", a, fqorvPlanLines(aCodes, a).mProducts.front(), theDir);
}

}  // namespace

int main(int argc, char** argv)
{
    if (argc > 1) setenv("QORVEX_THREADS", argv[1], 1);
    qtest::InProcessEnvironment aEnv;
    qtest::TempDir aDir("qorvex-bench-native");
    benchAsar(aDir.path());
    benchAlos(aDir.path());
    return 0;
}
