// The ENVISAT ASAR level 0 reader against a product, an instrument file and a DORIS orbit written
// here from the format tables: what it reads, the packets it walks, and what it refuses (the
// DORIS records through it).
#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <functional>
#include <string>
#include <vector>

#include "qorv_date.h"
#include "qorv_import_failure.h"
#include "qorv_native_reader.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

void putU16(std::string& b, std::size_t thePos, uint32_t theValue)
{
    b[thePos] = static_cast<char>(theValue >> 8);
    b[thePos + 1] = static_cast<char>(theValue);
}
void putU32(std::string& b, std::size_t thePos, uint32_t theValue)
{
    putU16(b, thePos, theValue >> 16);
    putU16(b, thePos + 2, theValue);
}
void putFloat(std::string& b, std::size_t thePos, float theValue) { putU32(b, thePos, std::bit_cast<uint32_t>(theValue)); }
/// KEY=value lines padded with blanks to theSize bytes, the last one a line feed.
std::string block(std::string theLines, std::size_t theSize)
{
    theLines.resize(theSize - 1, ' ');
    return theLines + '\n';
}
/// The main and specific product headers (1247 + 378 bytes) of an auxiliary product valid from
/// theStart to theStop.
std::string auxiliaryHeaders(const std::string& theProduct, const std::string& theStart, const std::string& theStop)
{
    return block("PRODUCT=\"" + theProduct + "\"\nSENSING_START=\"" + theStart + "\"\nSENSING_STOP=\"" + theStop +
                     "\"\nSPH_SIZE=+0000000378<bytes>\nNUM_DSD=+0000000001\nDSD_SIZE=+0000000280<bytes>\n",
                 1247) +
           block("SPH_DESCRIPTOR=\"AUXILIARY\"\n", 98) + block("DS_NAME=\"DATA\"\nDS_OFFSET=+00000000000000001625<bytes>\n", 280);
}

// The fixture's radar: IS2, the PRI, SWST, pulse and bandwidth codes of a real product.
constexpr double FS = 19207680.0;
constexpr uint32_t PRI = 11028, SWST = 1232;
constexpr int BEAM = 2;
constexpr int RANK[7] = {7, 8, 9, 10, 11, 12, 13};
float tableI(int k) { return 0.001f * static_cast<float>(k) - 2.0f; }
float tableQ(int k) { return 3.0f - 0.0005f * static_cast<float>(k); }

/// Packet k, sensed k PRIs after 10:00:00 on 1 March 2004, with theBytes of FBAQ blocks.
std::string packet(uint32_t k, uint8_t theFlags, uint32_t theBytes)
{
    const uint32_t L = theBytes + 30 - 1;
    std::string p(39 + L, '\x5a');
    const long long us = std::llround(k * PRI / FS * 1e6);
    const auto aDays = static_cast<uint32_t>(fqorvDaysFromCivil(2004, 3, 1) - fqorvDaysFromCivil(2000, 1, 1));
    const uint32_t aTime[3] = {aDays, static_cast<uint32_t>(36000 + us / 1000000), static_cast<uint32_t>(us % 1000000)};
    for (std::size_t i = 0; i < 3; ++i) putU32(p, 4 * i, aTime[i]);
    // ISP and packet lengths, data field header length, image mode, count (24 bits), PRI, SWST,
    // pulse (496 samples, beam adjust 5); beam set and FBAQ 8:4, flags, bandwidth code.
    for (const auto& [aPos, aValue] : {std::pair{24, L}, {36, L}, {38, 29u}, {40, 0x54u}, {47, 0u}, {49, 1000u + k}, {54, PRI},
                                       {56, SWST}, {62, 496u << 6 | 5}})
        putU16(p, static_cast<std::size_t>(aPos), aValue);
    p[51] = static_cast<char>(BEAM << 2 | 1);
    p[52] = static_cast<char>(theFlags);
    p[64] = static_cast<char>(255);
    return p;
}

/// Flags and sample bytes of the packets: two noise packets (one with the echo bit as well),
/// echoes, a calibration packet, and a last echo longer than the others.
struct CPacketPlan {
    uint8_t mFlags;
    uint32_t mBytes;
};
const std::vector<CPacketPlan> PACKETS = {{0x40, 138}, {0xC0, 138}, {0x80, 138}, {0x80, 138}, {0xA0, 138}, {0x80, 202}};

struct CAsarFixture {
    std::string mProduct, mInstrument, mOrbit;

    CAsarFixture()
    {
        mProduct = block("PRODUCT=\"ASA_IM__0PNPDE20040301_100000_000000162024_00394_10555_0001.N1\"\nPROC_CENTER=\"PDHS-E\"\n"
                         "SOFTWARE_VER=\"ASAR/3.08\"\nSENSING_START=\"01-MAR-2004 10:00:00.000000\"\n"
                         "SENSING_STOP=\"01-MAR-2004 10:00:16.000000\"\nABS_ORBIT=+10555\n"
                         "STATE_VECTOR_TIME=\"01-MAR-2004 09:59:00.000000\"\nX_POSITION=-0001234567.890<m>\n"
                         "Y_POSITION=+0005234567.125<m>\nZ_POSITION=+0004234567.500<m>\nX_VELOCITY=+0001234.567890<m/s>\n"
                         "Y_VELOCITY=-0002234.567890<m/s>\nZ_VELOCITY=+0007034.000000<m/s>\nVECTOR_SOURCE=\"FP\"\n"
                         "SPH_SIZE=+0000001956<bytes>\nNUM_DSD=+0000000004\nDSD_SIZE=+0000000280<bytes>\n",
                         1247) +
                   block("SPH_DESCRIPTOR=\"ASA_IM__0P SPECIFIC HEADER\"\nTX_RX_POLAR=\"V/V\"\nSWATH=\"IS2\"\n", 836) +
                   block("DS_NAME=\"ASAR_SOURCE_PACKETS         \"\nDS_TYPE=M\nDS_OFFSET=+00000000000000003203<bytes>\nNUM_DSR=+" +
                             std::to_string(PACKETS.size()) + "\nDSR_SIZE=-0000000001<bytes>\n",
                         280);
        for (const char* aName : {"LEVEL_0_CONFIG", "INSTRUMENT_FILE", "ORBIT_FILE"})
            mProduct += block("DS_NAME=\"" + std::string(aName) + "\"\nDS_TYPE=R\n", 280);
        for (std::size_t k = 0; k < PACKETS.size(); ++k) mProduct += packet(static_cast<uint32_t>(k), PACKETS[k].mFlags, PACKETS[k].mBytes);

        mInstrument = instrument("01-JAN-2003 00:00:00.000000", "31-DEC-2005 00:00:00.000000", 5.331e9f);

        // Four hours of vectors a minute apart from 08:00, whose values tell the minute m.
        mOrbit = auxiliaryHeaders("DOR_VOR_AXVF-P20040303_000000_20040301_080000_20040301_120000", "01-MAR-2004 08:00:00.000000",
                                  "01-MAR-2004 12:00:00.000000");
        for (int m = 0; m <= 240; ++m) {
            char aText[160];
            std::snprintf(aText, sizeof aText, "01-MAR-2004 %02d:%02d:00.000000 -0.412345 %.3f %.3f %.3f %.6f %.6f %.6f 0001",
                          8 + m / 60, m % 60, 1000.0 * m, -2.5 * m, 7000000.125, 0.5 * m, -7500.25, 1.0);
            mOrbit += block(aText, 129);
        }
    }

    /// An instrument file valid from theStart to theStop.
    static std::string instrument(const std::string& theStart, const std::string& theStop, float theCarrier)
    {
        std::string aData(171648, '\0');
        putFloat(aData, 16, theCarrier);
        putFloat(aData, 20, static_cast<float>(FS));
        putFloat(aData, 69912, 5.5e-7f);
        for (std::size_t k = 0; k < 4096; ++k) {
            putFloat(aData, 74656 + 4 * k, tableI(static_cast<int>(k)));
            putFloat(aData, 103328 + 4 * k, tableQ(static_cast<int>(k)));
        }
        for (std::size_t k = 0; k < 7; ++k) putU16(aData, 161594 + 2 * (14 + k), static_cast<uint32_t>(RANK[k]));
        return auxiliaryHeaders("ASA_INS_AXVIEC20040101_000000_20030101_000000_20051231_000000", theStart, theStop) + aData;
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
    qtest::writeFile(aTemp / "beside/p", f.mProduct);
    qtest::writeFile(aTemp / "beside/i", f.mInstrument);
    qtest::writeFile(aTemp / "beside/z", CAsarFixture::instrument("01-JAN-2006 00:00:00.000000", "31-DEC-2007 00:00:00.000000", 5.3e9f));
    qtest::writeFile(aTemp / "beside/o", f.mOrbit);
    qtest::writeFile(aTemp / "apart/p", f.mProduct);

    const std::pair<fs::path, CNativeOutsideFiles> aInputs[] = {{aTemp / "beside/p", {}},
                                                                {aTemp / "apart/p", {aTemp / "beside/i", aTemp / "beside/o"}}};
    for (const auto& [aInput, aOutside] : aInputs) {
        SCOPED_TRACE(aInput.string());
        const CNativeArchive a = fqorvReadNativeArchive(aInput, aOutside);
        EXPECT_EQ(a.mFamily, ENativeFamily::Asar);
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

        EXPECT_EQ(a.mLayout.mSamples, 189 + 9);   // the widest echo: 3 blocks and one of 10 bytes
        EXPECT_EQ(a.mLayout.mRecords, PACKETS.size());
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

TEST(AsarReader, PacketsOfImpossibleDaysAreFarOffClockReadings)
{
    // A day count far out of range once overflowed the packet's microsecond count (the sanitizer
    // suite tells). The readings stay on their side of the scene, centuries away, where the line
    // plan leaves them out.
    qtest::TempDir aTemp;
    CAsarFixture f;
    const std::size_t aPacket2 = 3203 + 2 * (68 + 138);
    putU32(f.mProduct, aPacket2, 0x7FFFFFFFu);
    putU32(f.mProduct, aPacket2 + 68 + 138, 0x80000000u);
    qtest::writeFile(aTemp / "p", f.mProduct);
    qtest::writeFile(aTemp / "i", f.mInstrument);
    qtest::writeFile(aTemp / "o", f.mOrbit);
    const CNativeArchive a = fqorvReadNativeArchive(aTemp / "p");
    const std::vector<CRecordCodes> aCodes = CNativeRecordFile(a.mLayout).scan();
    ASSERT_EQ(aCodes.size(), PACKETS.size());
    const double aCentury = 100 * 365.25 * 86400.0;
    EXPECT_GT(a.mClock.timeOf(aCodes[2].mClock), aCentury);
    EXPECT_LT(a.mClock.timeOf(aCodes[3].mClock), -aCentury);
    EXPECT_NEAR(a.mClock.timeOf(aCodes[4].mClock), 36000.0 + 4 * PRI / FS, 0.5e-6);
}

TEST(AsarReader, MissingOrWrongOutsideFilesAndBrokenPacketsAreRefused)
{
    // What each case changes: the files, the outside files given, in the directory d.
    struct CFiles {
        CAsarFixture f;
        CNativeOutsideFiles o;
        fs::path d;
    };
    struct CCase {
        const char* mName;
        std::function<void(CFiles&)> mChange;
        int mId;
        const char* mWords;
    };
    const std::size_t aPacket3 = 3203 + 3 * (68 + 138), aRecord3 = 1625 + 2 * 129;
    const CCase aCases[] = {
        {"no instrument file", [](CFiles& x) { x.f.mInstrument.clear(); }, 979212,
         "needs its instrument file ASA_INS_AX (none lies beside it): give it with --aux FILE"},
        {"instrument file short", [](CFiles& x) { x.f.mInstrument.pop_back(); }, 979213, "holds 171647 bytes behind its headers, not 171648"},
        {"orbit given as instrument", [](CFiles& x) { x.o.mInstrument = x.d / "o"; }, 979213, "is the product DOR_VOR_AX"},
        {"rank out of range", [](CFiles& x) { putU16(x.f.mInstrument, 1625 + 161594 + 30, 0); }, 979213, "a rank of 0 for the beam set IS2"},
        {"no instrument file that applies", [](CFiles& x) {
             x.f.mInstrument = CAsarFixture::instrument("01-JAN-2006 00:00:00.000000", "31-DEC-2007 00:00:00.000000", 5.331e9f);
             qtest::writeFile(x.d / "j", x.f.mInstrument);
         }, 979212, "none of the ASA_INS_AX products beside"},
        {"no orbit file", [](CFiles& x) { x.f.mOrbit.clear(); }, 979212,
         "needs a precise orbit, DOR_VOR_AX (none lies beside it): give it with --orbit FILE"},
        {"instrument given as orbit", [](CFiles& x) { x.o.mOrbit = x.d / "i"; }, 979213, "is the ENVISAT-format product ASA_INS_AX"},
        {"DORIS record garbled", [&](CFiles& x) { x.f.mOrbit[aRecord3 + 40] = 'x'; }, 979211,
         "record 3 at byte 1883 is not a time, dUT1 and six numbers"},
        {"DORIS time repeated", [&](CFiles& x) { x.f.mOrbit.replace(aRecord3 + 129, 27, x.f.mOrbit, aRecord3, 27); }, 979206,
         "record 4: its time is not after that of record 3"},
        {"packet past the end", [](CFiles& x) { x.f.mProduct.pop_back(); }, 979203,
         "packet 5 at byte 4233 of 270 bytes runs past the end of the file at byte 4502"},
        {"ISP length below 30", [&](CFiles& x) { putU16(x.f.mProduct, aPacket3 + 24, 29); }, 979203,
         "packet 3 at byte 3821 states an ISP length of 29 bytes"},
        {"echo of another mode", [&](CFiles& x) { putU16(x.f.mProduct, aPacket3 + 40, 0x32); }, 979203,
         "packet 3 at byte 3821 is an echo of the mode 0x32"},
        {"beam set 0", [](CFiles& x) { x.f.mProduct[3203 + 2 * (68 + 138) + 51] = 1; }, 979210, "beam set 0"},
        {"level 1 product", [](CFiles& x) { x.f.mProduct.replace(9, 10, "ASA_IMS_1P"); }, 979201,
         "ASA_IMS_1PNPDE20040301_100000_000000162024_00394_10555_0001.N1, not raw data"},
    };
    const CAsarFixture aGood;
    for (const CCase& aCase : aCases) {
        SCOPED_TRACE(aCase.mName);
        qtest::TempDir aTemp;
        CFiles x{aGood, {}, aTemp.path()};
        aCase.mChange(x);
        qtest::writeFile(aTemp / "p", x.f.mProduct);
        if (!x.f.mInstrument.empty()) qtest::writeFile(aTemp / "i", x.f.mInstrument);
        if (!x.f.mOrbit.empty()) qtest::writeFile(aTemp / "o", x.f.mOrbit);
        const auto [aId, aWords] = failureOf([&] { fqorvReadNativeArchive(aTemp / "p", x.o); });
        EXPECT_EQ(aId, aCase.mId) << aWords;
        EXPECT_NE(aWords.find(aCase.mWords), std::string::npos) << aWords;
    }
}
