// Raw products of ASAR and ALOS archives: the window, carrier and chirp each family's values give,
// and an ALOS product written from hand-made records (a repeat, lost lines filled, a slant range
// switch), read back byte by byte as the chain reads them. The ASAR packets' decoding is checked by
// the simulator's round trip and the imports focused end to end.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <fstream>
#include <string>
#include <vector>

#include "qorv_date.h"
#include "qorv_description_section.h"
#include "qorv_line_plan.h"
#include "qorv_native_reader.h"
#include "qorv_product_description.h"
#include "qorv_raw_product_writer.h"
#include "qorv_sim_native.h"
#include "qorv_sim_orbit.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;
using Bytes = std::vector<uint8_t>;

constexpr double kC = 299792458.0;
constexpr double kStart = 35560.0;   // s of day of the first pulse
constexpr double kAsarFs = 19.20768e6;
constexpr int kAsarPri = 11028;
constexpr uint32_t kAlosPrf = 2159827;   // mHz

uint32_t be32(const Bytes& b, std::size_t at)
{
    return (uint32_t{b[at]} << 24) | (uint32_t{b[at + 1]} << 16) | (uint32_t{b[at + 2]} << 8) | b[at + 3];
}
unsigned be16(const Bytes& b, std::size_t at) { return (unsigned{b[at]} << 8) | b[at + 1]; }

Bytes readBytes(const fs::path& thePath)
{
    std::ifstream f(thePath, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(f), {});
}

void writeBytes(const fs::path& thePath, const Bytes& theBytes)
{
    std::ofstream(thePath, std::ios::binary).write(reinterpret_cast<const char*>(theBytes.data()),
                                                   static_cast<std::streamsize>(theBytes.size()));
}

/// An archive of theFamily on a Kepler orbit (ERS-like, at 30 degrees of argument of latitude at
/// the first pulse), with the values its format states.
CNativeArchive fArchive(ENativeFamily theFamily)
{
    CNativeArchive a;
    a.mFamily = a.mLayout.mFamily = theFamily;
    a.mReferenceDay = fqorvDaysFromCivil(2008, 6, 12);
    a.mFormat = "test";
    CSimKepler k;
    k.mM0 = CSimKeplerOrbit::meanAnomalyForArgumentOfLatitude(k, 30.0 * CQORV_SIM_DEG);
    for (int i = -4; i <= 4; ++i)
        a.mStateVectors.push_back(fqorvSimStateVector(CSimKeplerOrbit(k).state(10.0 * i), kStart + 10.0 * i));
    a.mStateVectorSource = "test orbit";
    a.mClock.mReferenceTime = 0.0;
    a.mClock.mWraps32 = false;
    a.mClock.mLatchPulses = 0;
    if (theFamily == ENativeFamily::Asar) {
        a.mSensor = "ENVISAT-1";
        a.mCarrier = 5.331e9;
        a.mSamplingRate = kAsarFs;
        a.mPulseLength = 27.1e-6;
        a.mBandwidth = 16e6;
        a.mRank = 10;
        a.mRangeGateBias = 1.2e-6;
        a.mClock.mTickSeconds = 1e-6;
        a.mLayout.mSamplesPos = 68;
        // Values that name their table entry: I = index / 1000, Q = -index / 1000.
        for (int i = 0; i < 4096; ++i) {
            a.mFbaq.mI.push_back(i * 1e-3f);
            a.mFbaq.mQ.push_back(-i * 1e-3f);
        }
    } else if (theFamily == ENativeFamily::Alos) {
        a.mSensor = "ALOS_PALSAR";
        a.mWavelength = 0.236057;
        a.mSamplingRate = 32e6;
        a.mPulseLength = 27e-6;
        a.mBandwidth = 28e6;
        a.mOriginData = "ALOS_PALSAR_FBS10";
        a.mPolarisation = "HH";
        a.mIBias = a.mQBias = 15.5;
        a.mClock.mTickSeconds = 1e-3;
        a.mLayout.mSamplesPos = 412;
    } else {
        a.mSensor = "ERS-2";
        a.mClock.mWraps32 = true;
    }
    return a;
}

/// A product of 64 pulses from kStart, its first line's window theSwst (ERS, ASAR) or theRange.
CPlannedProduct fProduct(int thePriCode, double thePrf, int theSwst, int32_t theRange, int theSamples)
{
    CPlannedProduct p;
    p.mPriCode = thePriCode;
    p.mPrf = thePrf;
    p.mFirstSwst = theSwst;
    p.mFirstRange = theRange;
    p.mSamples = theSamples;
    p.mPulses = 64;
    p.mFirstPulseTime = kStart;
    p.mLines.resize(64);
    return p;
}

TEST(NativeProducts, EachFamilyGivesItsWindowCarrierAndChirp)
{
    const double aErsPrf = 1.0 / (2822 * 210.94e-9);
    struct CCase {
        ENativeFamily mFamily;
        CPlannedProduct mProduct;
        double mDelay, mCarrier, mChirpRate, mSamplingRate;
    };
    const CCase aCases[] = {
        {ENativeFamily::Ers, fProduct(2820, aErsPrf, 878, 0, 5616),
         878 * 4 / 18.962468e6 + 9 / aErsPrf - 6.622e-6, 5.3e9, 4.17788e11, 18.962468e6},
        {ENativeFamily::Asar, fProduct(kAsarPri, kAsarFs / kAsarPri, 6000, 0, 6656),
         (6000 + 10.0 * kAsarPri) / kAsarFs - 1.2e-6, 5.331e9, 16e6 / 27.1e-6, kAsarFs},
        {ENativeFamily::Alos, fProduct(kAlosPrf, kAlosPrf * 1e-3, 0, 850000, 4640), 2 * 850000 / kC, kC / 0.236057,
         -28e6 / 27e-6, 32e6},
    };
    for (const CCase& c : aCases) {
        SCOPED_TRACE(static_cast<int>(c.mFamily));
        const CProductDescription d = fqorvDescribeProduct(fArchive(c.mFamily), c.mProduct, {}, "");
        EXPECT_NEAR(d.mFirstDelay, c.mDelay, 1e-12);
        EXPECT_NEAR(d.mCarrier, c.mCarrier, 1.0);
        EXPECT_NEAR(d.mChirpRate, c.mChirpRate, 1.0);
        EXPECT_NEAR(d.mRangeSpacing, 0.5 * kC / c.mSamplingRate, 1e-9);
    }
    // ASAR and ALOS have no constants to stand in for what the archive leaves out.
    for (ENativeFamily f : {ENativeFamily::Asar, ENativeFamily::Alos}) {
        CNativeArchive a = fArchive(f);
        a.mSamplingRate = NAN;
        EXPECT_THROW(fqorvDescribeProduct(a, fProduct(kAsarPri, 1700.0, 6000, 850000, 100), {}, ""), std::exception);
    }
}

// ------------------------------------------------------------------------------------------------
// Products written and read back

TEST(NativeProducts, AlosRecordsKeepTheirBytesAndGetTheChainsCodes)
{
    // 40 records of 100 pixels and 20 bytes of right-fill behind a 720-byte descriptor: line 20
    // repeated at record 20 (dropped), 40 lines lost before record 30 (filled), the slant range
    // 90 m further from record 25.
    qtest::InProcessEnvironment aEnv;
    qtest::TempDir aDir;
    CNativeArchive a = fArchive(ENativeFamily::Alos);
    a.mLayout.mDataFile = aDir / "IMG-HH-test";
    a.mLayout.mFirstRecord = 720;
    a.mLayout.mRecordLength = 412 + 200 + 20;
    a.mLayout.mSamples = 100;
    a.mLayout.mSuffix = 20;
    Bytes aFile(720, 0);
    std::vector<CRecordCodes> aCodes;
    for (int r = 0; r < 40; ++r) {
        const int aNumber = r < 20 ? r + 1 : r < 30 ? r : r + 40;
        CRecordCodes c;
        c.mMarker = true;
        c.mCounter = static_cast<uint32_t>(aNumber);
        c.mClock = static_cast<int64_t>(std::floor((kStart + (aNumber - 1) / (kAlosPrf * 1e-3)) * 1e3));
        c.mPrfMilliHz = kAlosPrf;
        c.mRange = r < 25 ? 850000 : 850090;
        aCodes.push_back(c);
        Bytes aRecord(a.mLayout.mRecordLength, 0xEE);
        std::memset(aRecord.data(), 0, 412);
        std::memcpy(aRecord.data() + 200, "ALOS", 4);
        for (int j = 0; j < 200; ++j) aRecord[412 + j] = static_cast<uint8_t>((r * 3 + j) % 32);
        aFile.insert(aFile.end(), aRecord.begin(), aRecord.end());
    }
    writeBytes(a.mLayout.mDataFile, aFile);

    const CLinePlan aPlan = fqorvPlanLines(aCodes, a);
    ASSERT_EQ(aPlan.mProducts.size(), 1u);
    const CPlannedProduct& p = aPlan.mProducts.front();
    const CProductDescription d = fqorvDescribeProduct(a, p, {}, "");
    CNativeRecordFile aRecords(a.mLayout);
    fqorvWriteRawProduct(a, aRecords, p, d, aDir / "alos_raw");

    const Bytes aRaw = readBytes(aDir / "alos_raw");
    const std::size_t aLine = 412 + 200;
    ASSERT_EQ(aRaw.size(), 79 * aLine);
    for (std::size_t i = 0; i < 79; ++i) {
        SCOPED_TRACE(i);
        const std::size_t at = i * aLine;
        const int r = i < 20 ? static_cast<int>(i) : i < 29 ? static_cast<int>(i) + 1 : i < 69 ? -1 : static_cast<int>(i) - 39;
        EXPECT_EQ(be32(aRaw, at + 12), i + 1);
        EXPECT_EQ(be32(aRaw, at + 116), r >= 25 || (r < 0 && i >= 29) ? 850090u : 850000u);
        EXPECT_EQ(be16(aRaw, at + 60), 2193u) << "the ERS code of 2159.827 Hz";
        EXPECT_EQ(std::string(aRaw.begin() + at + 200, aRaw.begin() + at + 204), r < 0 ? std::string(4, '\0') : "ALOS");
        for (int j = 0; j < 200; ++j) {
            const int aWant = r >= 0 ? (r * 3 + j) % 32 : (j % 2 == 0 ? 15 + (j / 2) % 2 : 16 - (j / 2) % 2);
            ASSERT_EQ(aRaw[at + 412 + j], aWant) << "byte " << j;
        }
    }

    auto h = CDescriptionHeader::makeFull();
    ASSERT_TRUE(h->read((aDir / "alos_raw").c_str(), true));
    EXPECT_STREQ((*h)["Sensor.SensorName"].getString(), "ALOS_PALSAR");
    EXPECT_STREQ((*h)["RasterInfo.CellType"].getString(), "UBYTE_COMPLEX");
    EXPECT_STREQ((*h)["Sensor.Chirp"].getString(), "DOWN_CHIRP");
    EXPECT_STREQ((*h)["ChannelInfo.Description"].getString(0), "HH");
    EXPECT_EQ((*h)["RasterInfo.RowPrefix"].getInteger(), 412);
    EXPECT_EQ((*h)["RasterInfo.RowSuffix"].getInteger(), 0);
    EXPECT_NEAR((*h)["ChannelInfo.PRFExtracted"].getDouble(0), 2159.827, 1e-9);
    EXPECT_NEAR((*h)["Processing.FastTime"].getDouble(0), 2 * 850000 / kC, 1e-12);
    std::string aKey;
    EXPECT_TRUE(fqorvGetUserKey(*h, "ORIGIN DATA", aKey));
    EXPECT_EQ(aKey, "ALOS_PALSAR_FBS10");
    EXPECT_TRUE(fqorvGetUserKey(*h, "IMPORT IQ BIAS", aKey));
    EXPECT_FALSE(fqorvGetUserKey(*h, "OTHER_INFO_I_ESTIMATION", aKey)) << "the chain measures the offsets itself";
}

}  // namespace
