// The ENVISAT ASAR level 0 reader against a product, an instrument file and a DORIS orbit written
// here from the format tables: what it reads, the packets it walks, and what it refuses.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "qorv_date.h"
#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"
#include "qorv_native_reader.h"
#include "qorv_orbit_file.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;
using Bytes = std::vector<uint8_t>;

void putU16(Bytes& b, std::size_t thePos, uint16_t theValue)
{
    b[thePos] = static_cast<uint8_t>(theValue >> 8);
    b[thePos + 1] = static_cast<uint8_t>(theValue);
}
void putU32(Bytes& b, std::size_t thePos, uint32_t theValue)
{
    for (int i = 0; i < 4; ++i) b[thePos + static_cast<std::size_t>(i)] = static_cast<uint8_t>(theValue >> (24 - 8 * i));
}
void putFloat(Bytes& b, std::size_t thePos, float theValue)
{
    uint32_t aBits;
    std::memcpy(&aBits, &theValue, sizeof aBits);
    putU32(b, thePos, aBits);
}
void append(Bytes& theTo, const Bytes& theFrom) { theTo.insert(theTo.end(), theFrom.begin(), theFrom.end()); }
void writeBytes(const fs::path& thePath, const Bytes& theBytes)
{
    std::ofstream(thePath, std::ios::binary).write(reinterpret_cast<const char*>(theBytes.data()), static_cast<std::streamsize>(theBytes.size()));
}
/// KEY=value lines padded with blanks to theSize bytes, the last one a line feed.
Bytes block(const std::string& theLines, std::size_t theSize)
{
    Bytes aBlock(theSize, ' ');
    std::copy(theLines.begin(), theLines.end(), aBlock.begin());
    aBlock.back() = '\n';
    return aBlock;
}
/// The main and specific product headers of an auxiliary product valid from theStart to theStop,
/// with one descriptor: 1247 + 378 bytes.
Bytes auxiliaryHeaders(const std::string& theProduct, const std::string& theStart, const std::string& theStop)
{
    Bytes aBytes = block("PRODUCT=\"" + theProduct + "\"\nSENSING_START=\"" + theStart + "\"\nSENSING_STOP=\"" + theStop +
                             "\"\nSPH_SIZE=+0000000378<bytes>\nNUM_DSD=+0000000001\nDSD_SIZE=+0000000280<bytes>\n",
                         1247);
    append(aBytes, block("SPH_DESCRIPTOR=\"AUXILIARY\"\n", 98));
    append(aBytes, block("DS_NAME=\"DATA\"\nDS_OFFSET=+00000000000000001625<bytes>\n", 280));
    return aBytes;
}

// The fixture's radar: IS2, the PRI, SWST, pulse and bandwidth codes of a real product.
constexpr double FS = 19207680.0;
constexpr uint16_t PRI = 11028;
constexpr uint16_t SWST = 1232;
constexpr int BEAM = 2;
constexpr int RANK[7] = {7, 8, 9, 10, 11, 12, 13};
constexpr std::size_t INSTRUMENT_BYTES = 171648;
float tableI(int k) { return 0.001f * static_cast<float>(k) - 2.0f; }
float tableQ(int k) { return 3.0f - 0.0005f * static_cast<float>(k); }

/// Packet k of the fixture, sensed k PRIs after 10:00:00 on 1 March 2004, with theBytes of FBAQ blocks.
Bytes packet(int k, uint8_t theFlags, uint32_t theBytes)
{
    const uint32_t L = theBytes + 30 - 1;
    Bytes p(39 + L, 0);
    const int64_t aMicroseconds = static_cast<int64_t>(std::llround(k * PRI / FS * 1e6));
    putU32(p, 0, static_cast<uint32_t>(fqorvDaysFromCivil(2004, 3, 1) - fqorvDaysFromCivil(2000, 1, 1)));
    putU32(p, 4, static_cast<uint32_t>(36000 + aMicroseconds / 1000000));
    putU32(p, 8, static_cast<uint32_t>(aMicroseconds % 1000000));
    putU16(p, 24, static_cast<uint16_t>(L));
    putU16(p, 36, static_cast<uint16_t>(L));
    putU16(p, 38, 29);
    putU16(p, 40, 0x54);
    p[48] = 0;
    putU16(p, 49, static_cast<uint16_t>(1000 + k));
    p[51] = static_cast<uint8_t>(BEAM << 2 | 1);
    p[52] = theFlags;
    putU16(p, 54, PRI);
    putU16(p, 56, SWST);
    putU16(p, 62, static_cast<uint16_t>(496 << 6 | 5));
    p[64] = 255;
    for (std::size_t i = 68; i < p.size(); ++i) p[i] = static_cast<uint8_t>(i * 7);
    return p;
}

/// The flags and sample bytes of the fixture's packets: two noise packets (one with the echo bit
/// as well), echoes, a calibration packet, and a last echo longer than the others.
struct CPacketPlan {
    uint8_t mFlags;
    uint32_t mBytes;
};
const std::vector<CPacketPlan> PACKETS = {{0x40, 138}, {0xC0, 138}, {0x80, 138}, {0x80, 138}, {0xA0, 138}, {0x80, 202}};

struct CAsarFixture {
    Bytes mProduct, mInstrument, mOrbit;

    CAsarFixture()
    {
        mProduct = block("PRODUCT=\"ASA_IM__0PNPDE20040301_100000_000000162024_00394_10555_0001.N1\"\nPROC_CENTER=\"PDHS-E\"\n"
                         "SOFTWARE_VER=\"ASAR/3.08\"\nSENSING_START=\"01-MAR-2004 10:00:00.000000\"\n"
                         "SENSING_STOP=\"01-MAR-2004 10:00:16.000000\"\nABS_ORBIT=+10555\n"
                         "STATE_VECTOR_TIME=\"01-MAR-2004 09:59:00.000000\"\nX_POSITION=-0001234567.890<m>\n"
                         "Y_POSITION=+0005234567.125<m>\nZ_POSITION=+0004234567.500<m>\nX_VELOCITY=+0001234.567890<m/s>\n"
                         "Y_VELOCITY=-0002234.567890<m/s>\nZ_VELOCITY=+0007034.000000<m/s>\nVECTOR_SOURCE=\"FP\"\n"
                         "SPH_SIZE=+0000001956<bytes>\nNUM_DSD=+0000000004\nDSD_SIZE=+0000000280<bytes>\n",
                         1247);
        append(mProduct, block("SPH_DESCRIPTOR=\"ASA_IM__0P SPECIFIC HEADER\"\nTX_RX_POLAR=\"V/V\"\nSWATH=\"IS2\"\n", 836));
        append(mProduct, block("DS_NAME=\"ASAR_SOURCE_PACKETS         \"\nDS_TYPE=M\nDS_OFFSET=+00000000000000003203<bytes>\n"
                               "NUM_DSR=+" + std::to_string(PACKETS.size()) + "\nDSR_SIZE=-0000000001<bytes>\n",
                               280));
        for (const char* aName : {"LEVEL_0_CONFIG", "INSTRUMENT_FILE", "ORBIT_FILE"})
            append(mProduct, block("DS_NAME=\"" + std::string(aName) + "\"\nDS_TYPE=R\n", 280));
        for (std::size_t k = 0; k < PACKETS.size(); ++k) append(mProduct, packet(static_cast<int>(k), PACKETS[k].mFlags, PACKETS[k].mBytes));

        mInstrument = instrument("01-JAN-2003 00:00:00.000000", "31-DEC-2005 00:00:00.000000", 5.331e9f);

        // Four hours of vectors a minute apart, from 08:00.
        mOrbit = auxiliaryHeaders("DOR_VOR_AXVF-P20040303_000000_20040301_080000_20040301_120000",
                                  "01-MAR-2004 08:00:00.000000", "01-MAR-2004 12:00:00.000000");
        for (int m = 0; m <= 240; ++m) append(mOrbit, dorisRecord(m));
    }

    /// An instrument file valid from theStart to theStop.
    static Bytes instrument(const std::string& theStart, const std::string& theStop, float theCarrier)
    {
        Bytes aFile = auxiliaryHeaders("ASA_INS_AXVIEC20040101_000000_20030101_000000_20051231_000000", theStart, theStop);
        Bytes aData(INSTRUMENT_BYTES, 0);
        putFloat(aData, 16, theCarrier);
        putFloat(aData, 20, static_cast<float>(FS));
        putFloat(aData, 69912, 5.5e-7f);
        for (int k = 0; k < 4096; ++k) {
            putFloat(aData, 74656 + 4 * static_cast<std::size_t>(k), tableI(k));
            putFloat(aData, 103328 + 4 * static_cast<std::size_t>(k), tableQ(k));
        }
        for (int k = 0; k < 7; ++k) putU16(aData, 161594 + 2 * (14 + static_cast<std::size_t>(k)), static_cast<uint16_t>(RANK[k]));
        append(aFile, aData);
        return aFile;
    }

    /// The vector of minute m from 08:00: positions and velocities that tell the minute.
    static Bytes dorisRecord(int m)
    {
        char aText[160];
        std::snprintf(aText, sizeof aText, "01-MAR-2004 %02d:%02d:00.000000 -0.412345 %.3f %.3f %.3f %.6f %.6f %.6f 0001", 8 + m / 60,
                      m % 60, 1000.0 * m, -2.5 * m, 7000000.125, 0.5 * m, -7500.25, 1.0);
        std::string aRecord(aText);
        aRecord.resize(128, ' ');
        aRecord += '\n';
        return Bytes(aRecord.begin(), aRecord.end());
    }
};

/// Runs theRead and returns the failure's id and words (0 when it succeeded).
std::pair<int, std::string> failureOf(const std::function<void()>& theRead)
{
    try {
        theRead();
    } catch (const CImportFailure& aFailure) {
        return {aFailure.id(), aFailure.parameter()};
    }
    return {0, ""};
}

}  // namespace

TEST(AsarReader, ProductAndItsOutsideFilesReadBack)
{
    qtest::TempDir aTemp;
    const CAsarFixture f;
    // Beside the product under names that say nothing (with an instrument file of other years,
    // last by name), and apart, given by name.
    fs::create_directories(aTemp / "beside");
    fs::create_directories(aTemp / "apart");
    writeBytes(aTemp / "beside/p", f.mProduct);
    writeBytes(aTemp / "beside/i", f.mInstrument);
    writeBytes(aTemp / "beside/z", CAsarFixture::instrument("01-JAN-2006 00:00:00.000000", "31-DEC-2007 00:00:00.000000", 5.3e9f));
    writeBytes(aTemp / "beside/o", f.mOrbit);
    writeBytes(aTemp / "apart/p", f.mProduct);
    const CNativeOutsideFiles aGiven{aTemp / "beside/i", aTemp / "beside/o"};

    const std::pair<fs::path, CNativeOutsideFiles> aInputs[] = {{aTemp / "beside/p", {}}, {aTemp / "apart/p", aGiven}};
    for (const auto& [aInput, aOutside] : aInputs) {
        SCOPED_TRACE(aInput.string());
        const CNativeArchive a = fqorvReadNativeArchive(aInput, aOutside);
        EXPECT_EQ(a.mFamily, ENativeFamily::Asar);
        EXPECT_EQ(a.mFormat, "ASAR ENVISAT format");
        EXPECT_EQ(a.mSensor, "ENVISAT-1");
        EXPECT_EQ(a.mOrbit, 10555);
        EXPECT_EQ(a.mFacility, "PDHS-E");
        EXPECT_EQ(a.mPolarisation, "VV");
        EXPECT_EQ(a.mReferenceDay, fqorvDaysFromCivil(2004, 3, 1));
        EXPECT_EQ(a.mSensingStart, 36000.0);
        ASSERT_EQ(a.mFiles.size(), 3u);
        EXPECT_EQ(a.mFiles[1], aTemp / "beside/i");

        // The radar: the instrument file's values, the first echo packet's codes.
        EXPECT_EQ(a.mBeamSet, BEAM);
        EXPECT_EQ(a.mRank, RANK[BEAM - 1]);
        EXPECT_EQ(a.mCarrier, static_cast<double>(5.331e9f));
        EXPECT_DOUBLE_EQ(a.mWavelength, 299792458.0 / static_cast<double>(5.331e9f));
        EXPECT_EQ(a.mSamplingRate, FS);
        EXPECT_EQ(a.mRangeGateBias, static_cast<double>(5.5e-7f));
        EXPECT_DOUBLE_EQ(a.mPulseLength, 496 / FS);
        EXPECT_DOUBLE_EQ(a.mBandwidth, 16e6);
        EXPECT_DOUBLE_EQ(a.mChirpRate, 16e6 / (496 / FS));
        EXPECT_DOUBLE_EQ(a.mPrf, FS / PRI);
        ASSERT_EQ(a.mFbaq.mI.size(), 4096u);
        EXPECT_EQ(a.mFbaq.mI[4095], tableI(4095));
        EXPECT_EQ(a.mFbaq.mQ[17], tableQ(17));

        // The orbit: the DORIS vectors within minutes of the scene, not the header's one.
        EXPECT_EQ(a.mStateVectorSource, "DORIS orbit file o");
        ASSERT_EQ(a.mStateVectors.size(), 11u);
        EXPECT_EQ(a.mStateVectors.front().mTime, 35700.0);
        EXPECT_EQ(a.mStateVectors.front().mPosition[0], 1000.0 * 115);
        EXPECT_EQ(a.mStateVectors.front().mVelocity[1], -7500.25);

        const CNativeRecordLayout& l = a.mLayout;
        EXPECT_TRUE(l.mVariable);
        EXPECT_EQ(l.mFirstRecord, 3203u);
        EXPECT_EQ(l.mSamplesPos, 68u);
        EXPECT_EQ(l.mSamples, 189 + 9);   // the widest echo: 3 blocks and one of 10 bytes
        EXPECT_EQ(l.mRecords, PACKETS.size());
        EXPECT_FALSE(a.mTruncated);
    }

    // The walk: every packet by its own length, noise and calibration packets told apart, the
    // sensing time on the clock of the reference day.
    const CNativeArchive a = fqorvReadNativeArchive(aTemp / "beside/p");
    int aLastPercent = -1;
    const std::vector<CRecordCodes> aCodes = CNativeRecordFile(a.mLayout).scan([&](int thePercent) { aLastPercent = thePercent; });
    EXPECT_EQ(aLastPercent, 100);
    ASSERT_EQ(aCodes.size(), PACKETS.size());
    uint64_t aOffset = 3203;
    for (std::size_t k = 0; k < aCodes.size(); ++k) {
        SCOPED_TRACE(k);
        const CRecordCodes& c = aCodes[k];
        EXPECT_EQ(c.mEcho, PACKETS[k].mFlags == 0x80);
        EXPECT_EQ(c.mCounter, 1000 + k);
        EXPECT_EQ(c.mPri, PRI);
        EXPECT_EQ(c.mSwst, SWST);
        EXPECT_EQ(c.mOffset, aOffset);
        EXPECT_EQ(c.mLength, 68 + PACKETS[k].mBytes);
        EXPECT_EQ(c.mSamples, PACKETS[k].mBytes == 138 ? 126u + 9u : 189u + 9u);
        EXPECT_NEAR(a.mClock.timeOf(c.mClock), 36000.0 + k * PRI / FS, 0.5e-6);
        aOffset += c.mLength;
    }
}

TEST(AsarReader, MissingOrWrongOutsideFilesAndBrokenPacketsAreRefused)
{
    const CAsarFixture aGood;
    const std::size_t aPacket3 = 3203 + 3 * (68 + 138);
    struct CCase {
        const char* mName;
        std::function<void(CAsarFixture&, CNativeOutsideFiles&, const fs::path&)> mChange;
        int mId;
        const char* mWords;
    };
    const CCase aCases[] = {
        {"no instrument file", [](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { f.mInstrument.clear(); }, 979212,
         "needs its instrument file ASA_INS_AX (none lies beside it): give it with --aux FILE"},
        {"instrument file short", [](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { f.mInstrument.resize(f.mInstrument.size() - 4); },
         979213, "holds 171644 bytes behind its headers, not 171648"},
        {"orbit given as instrument", [](CAsarFixture&, CNativeOutsideFiles& o, const fs::path& d) { o.mInstrument = d / "o"; }, 979213,
         "is the product DOR_VOR_AX"},
        {"rank out of range", [](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { putU16(f.mInstrument, 1625 + 161594 + 30, 0); },
         979213, "a rank of 0 for the beam set IS2"},
        {"no instrument file that applies", [](CAsarFixture& f, CNativeOutsideFiles&, const fs::path& d) {
             f.mInstrument = CAsarFixture::instrument("01-JAN-2006 00:00:00.000000", "31-DEC-2007 00:00:00.000000", 5.331e9f);
             writeBytes(d / "j", f.mInstrument);
         }, 979212, "none of the ASA_INS_AX products beside"},
        {"no orbit file", [](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { f.mOrbit.clear(); }, 979212,
         "needs a precise orbit, DOR_VOR_AX (none lies beside it): give it with --orbit FILE"},
        {"instrument given as orbit", [](CAsarFixture&, CNativeOutsideFiles& o, const fs::path& d) { o.mOrbit = d / "i"; }, 979213,
         "is the ENVISAT-format product ASA_INS_AX"},
        {"packet past the end", [](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { f.mProduct.resize(f.mProduct.size() - 1); },
         979203, "packet 5 at byte 4233 of 270 bytes runs past the end of the file at byte 4502"},
        {"ISP length below 30", [&](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { putU16(f.mProduct, aPacket3 + 24, 29); },
         979203, "packet 3 at byte 3821 states an ISP length of 29 bytes"},
        {"echo of another mode", [&](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { putU16(f.mProduct, aPacket3 + 40, 0x32); },
         979203, "packet 3 at byte 3821 is an echo of the mode 0x32"},
        {"beam set 0", [&](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { f.mProduct[3203 + 2 * (68 + 138) + 51] = 1; },
         979210, "beam set 0"},
        {"level 1 product", [](CAsarFixture& f, CNativeOutsideFiles&, const fs::path&) { std::memcpy(f.mProduct.data() + 9, "ASA_IMS_1P", 10); },
         979201, "ASA_IMS_1PNPDE20040301_100000_000000162024_00394_10555_0001.N1, not raw data"},
    };
    for (const CCase& aCase : aCases) {
        SCOPED_TRACE(aCase.mName);
        qtest::TempDir aTemp;
        CAsarFixture f = aGood;
        CNativeOutsideFiles aOutside;
        aCase.mChange(f, aOutside, aTemp.path());
        writeBytes(aTemp / "p", f.mProduct);
        if (!f.mInstrument.empty()) writeBytes(aTemp / "i", f.mInstrument);
        if (!f.mOrbit.empty()) writeBytes(aTemp / "o", f.mOrbit);
        const auto [aId, aWords] = failureOf([&] { fqorvReadNativeArchive(aTemp / "p", aOutside); });
        EXPECT_EQ(aId, aCase.mId) << aWords;
        EXPECT_NE(aWords.find(aCase.mWords), std::string::npos) << aWords;
    }
}

TEST(OrbitFile, DorisRecordsAreReadAndBrokenOnesNamed)
{
    qtest::TempDir aTemp;
    const long aDay = fqorvDaysFromCivil(2004, 3, 1);
    Bytes aOrbit = CAsarFixture().mOrbit;
    writeBytes(aTemp / "doris", aOrbit);
    const std::vector<CStateVector> v = fqorvReadOrbitFile(aTemp / "doris", aDay);
    ASSERT_EQ(v.size(), 241u);
    EXPECT_EQ(v[3].mTime, 8 * 3600.0 + 180.0);
    EXPECT_EQ(v[3].mPosition[0], 3000.0);
    EXPECT_EQ(v[3].mPosition[1], -7.5);
    EXPECT_EQ(v[3].mPosition[2], 7000000.125);
    EXPECT_EQ(v[3].mVelocity[0], 1.5);
    EXPECT_EQ(v[240].mTime, 12 * 3600.0);

    const std::size_t aRecord3 = 1625 + 2 * 129;
    struct CCase {
        const char* mName;
        std::function<void(Bytes&)> mChange;
        int mId;
        const char* mWords;
    };
    const CCase aCases[] = {
        {"a number garbled", [&](Bytes& b) { b[aRecord3 + 40] = 'x'; }, 979211, "record 3 at byte 1883 is not a time, dUT1 and six numbers"},
        {"a time repeated", [&](Bytes& b) { std::copy_n(b.begin() + 1625 + 2 * 129, 27, b.begin() + 1625 + 3 * 129); }, 979206,
         "record 4: its time is not after that of record 3"},
        {"three records", [&](Bytes& b) { b.resize(1625 + 3 * 129); }, 979211, "holds 3 state vectors, at least 4"},
    };
    for (const CCase& aCase : aCases) {
        SCOPED_TRACE(aCase.mName);
        Bytes aBytes = aOrbit;
        aCase.mChange(aBytes);
        writeBytes(aTemp / "broken", aBytes);
        const auto [aId, aWords] = failureOf([&] { fqorvReadOrbitFile(aTemp / "broken", aDay); });
        EXPECT_EQ(aId, aCase.mId) << aWords;
        EXPECT_NE(aWords.find(aCase.mWords), std::string::npos) << aWords;
    }
}
