// The readers of native ERS archives against fixtures written here from the format tables: an ERS
// CEOS product with the values quoted from real products, each facility's record layout, an
// ENVISAT-format product, and the archives each refusal is for.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "qorv_ceos_records.h"
#include "qorv_date.h"
#include "qorv_import_failure.h"
#include "qorv_native_reader.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;
using Bytes = std::vector<uint8_t>;

void putText(Bytes& theBytes, std::size_t thePos, int theWidth, const std::string& theText, bool theRight = false)
{
    std::string aField(static_cast<std::size_t>(theWidth), ' ');
    aField.replace(theRight ? aField.size() - theText.size() : 0, theText.size(), theText);
    std::copy(aField.begin(), aField.end(), theBytes.begin() + static_cast<std::ptrdiff_t>(thePos));
}
void putNumber(Bytes& theBytes, std::size_t thePos, int theWidth, const std::string& theText)
{
    putText(theBytes, thePos, theWidth, theText, true);
}
void putU32(Bytes& theBytes, std::size_t thePos, uint32_t theValue)
{
    for (int i = 0; i < 4; ++i) theBytes[thePos + i] = static_cast<uint8_t>(theValue >> (24 - 8 * i));
}
void putU16(Bytes& theBytes, std::size_t thePos, uint16_t theValue)
{
    theBytes[thePos] = static_cast<uint8_t>(theValue >> 8);
    theBytes[thePos + 1] = static_cast<uint8_t>(theValue);
}
void replaceText(Bytes& theBytes, const std::string& theOld, const std::string& theNew)
{
    const auto aAt = std::search(theBytes.begin(), theBytes.end(), theOld.begin(), theOld.end());
    ASSERT_NE(aAt, theBytes.end()) << theOld;
    std::copy(theNew.begin(), theNew.end(), aAt);
}
void append(Bytes& theTo, const Bytes& theFrom) { theTo.insert(theTo.end(), theFrom.begin(), theFrom.end()); }
void writeBytes(const fs::path& thePath, const Bytes& theBytes)
{
    std::ofstream(thePath, std::ios::binary).write(reinterpret_cast<const char*>(theBytes.data()), static_cast<std::streamsize>(theBytes.size()));
}

Bytes ceosRecord(uint32_t theSequence, std::array<uint8_t, 4> theType, uint32_t theLength)
{
    Bytes aRecord(theLength, 0);
    putU32(aRecord, 0, theSequence);
    std::copy(theType.begin(), theType.end(), aRecord.begin() + 4);
    putU32(aRecord, 8, theLength);
    return aRecord;
}

/// The codes the fixtures write into record i, and its samples.
uint32_t counterOf(uint64_t i) { return 1000 + static_cast<uint32_t>(i); }
uint32_t clockOf(uint64_t i) { return 2000000000u + 401664u + static_cast<uint32_t>(i / 4); }
uint8_t sampleOf(uint64_t i, int k) { return static_cast<uint8_t>((i + static_cast<uint64_t>(k)) % 32); }

struct CVariant {
    uint32_t mLength;
    int mPrefix;
    int mCounter;
    const char* mName;
};
constexpr CVariant PGS{11644, 412, 210, "PGS/VMP"};

/// Line records of theLength bytes: own length at theLengthPos (CEOS u32, or the ENVISAT u16 ISP
/// length), the auxiliary block around theCounter, samples from thePrefix.
Bytes lineRecords(uint64_t theCount, uint32_t theLength, int thePrefix, int theCounter, bool theCeos)
{
    Bytes aAll;
    for (uint64_t i = 0; i < theCount; ++i) {
        Bytes aRecord = theCeos ? ceosRecord(static_cast<uint32_t>(i + 2), {50, 10, 31, 20}, theLength) : Bytes(theLength, 0);
        if (!theCeos) putU16(aRecord, 24, static_cast<uint16_t>(theLength - 33));
        aRecord[static_cast<std::size_t>(theCounter - 8)] = 0xAA;
        putU32(aRecord, static_cast<std::size_t>(theCounter - 6), clockOf(i));
        putU32(aRecord, static_cast<std::size_t>(theCounter), counterOf(i));
        putU16(aRecord, static_cast<std::size_t>(theCounter + 4), 900);
        putU16(aRecord, static_cast<std::size_t>(theCounter + 6), 2820);
        for (int k = 0; k < 2 * static_cast<int>((theLength - static_cast<uint32_t>(thePrefix)) / 2); ++k)
            aRecord[static_cast<std::size_t>(thePrefix + k)] = sampleOf(i, k);
        append(aAll, aRecord);
    }
    return aAll;
}

constexpr std::size_t DSS = 720;          // data set summary in the fixture's leader
constexpr std::size_t PPR = 720 + 1886 + 1620;   // platform position, behind a record of another kind

/// An ERS-2 CEOS product with the values quoted from real products. The binary time's UTC lies
/// before midnight and the scene after it.
struct CCeosFixture {
    Bytes mLeader;
    Bytes mData;

    explicit CCeosFixture(const CVariant& theVariant = PGS, uint64_t theRecords = 6)
    {
        mLeader = ceosRecord(1, {63, 192, 18, 18}, 720);
        Bytes aDss = ceosRecord(2, {10, 10, 31, 20}, 1886);
        putText(aDss, 68, 32, "19960322000013500");
        putNumber(aDss, 116, 16, "45.123");
        putNumber(aDss, 132, 16, "252.918");
        putText(aDss, 396, 16, "ERS2");
        putText(aDss, 412, 32, "SAR- C-HR-IM-VV");
        putNumber(aDss, 444, 8, "4851");
        putNumber(aDss, 484, 8, "23.000");
        putNumber(aDss, 500, 16, "0.0566660");
        putNumber(aDss, 646, 16, "2.08894E+11");
        putNumber(aDss, 710, 16, "18.9624680");
        putNumber(aDss, 726, 16, "-9999999.9999999");
        putNumber(aDss, 742, 16, "37.12");
        putNumber(aDss, 818, 16, "-9999999.9");
        putNumber(aDss, 834, 16, "-9999999.9");
        putNumber(aDss, 934, 16, "1679.9023438");
        putNumber(aDss, 982, 16, "2000000000");
        putText(aDss, 998, 32, "19960321235950109");
        putText(aDss, 1046, 16, "D-PAF");
        putText(aDss, 1062, 8, "PGS-ERS");
        append(mLeader, aDss);
        append(mLeader, ceosRecord(3, {10, 20, 31, 20}, 1620));
        Bytes aPpr = ceosRecord(4, {10, 30, 31, 20}, 1046);
        for (auto [aPos, aText] : {std::pair{140, "5"}, {144, "1996"}, {148, "3"}, {152, "22"}, {156, "82"}})
            putNumber(aPpr, static_cast<std::size_t>(aPos), 4, aText);
        putNumber(aPpr, 160, 22, "5.000000");
        putNumber(aPpr, 182, 22, "4.2");
        putText(aPpr, 204, 64, "Earth Centred Rotating");
        for (int k = 0; k < 5; ++k)
            for (int i = 0; i < 6; ++i) putNumber(aPpr, static_cast<std::size_t>(386 + 132 * k + 22 * i), 22, std::to_string(1000 * k + i) + ".5");
        append(mLeader, aPpr);

        mData = ceosRecord(1, {63, 192, 18, 18}, theVariant.mLength);
        const int aSamples = static_cast<int>(theVariant.mLength - static_cast<uint32_t>(theVariant.mPrefix)) / 2;
        putNumber(mData, 186, 6, std::to_string(theVariant.mLength));
        putNumber(mData, 236, 8, std::to_string(theRecords));
        putNumber(mData, 248, 8, std::to_string(aSamples));
        putNumber(mData, 276, 4, std::to_string(theVariant.mPrefix - 12));
        putNumber(mData, 280, 8, std::to_string(2 * aSamples));
        putNumber(mData, 288, 4, "0");
        putText(mData, 400, 28, "COMPLEX UNSIGNED INTEGER");
        putText(mData, 428, 4, "CI*2");
        append(mData, lineRecords(theRecords, theVariant.mLength, theVariant.mPrefix, theVariant.mCounter, true));
    }

    /// The product directory: leader, data file and a volume directory, under names that say nothing.
    fs::path write(const fs::path& theDir) const
    {
        fs::create_directories(theDir);
        writeBytes(theDir / "a", mLeader);
        writeBytes(theDir / "b", mData);
        Bytes aVolume = ceosRecord(1, {192, 192, 18, 18}, 360);
        append(aVolume, ceosRecord(2, {219, 192, 18, 18}, 360));
        writeBytes(theDir / "c", aVolume);
        return theDir;
    }
};

/// An ERS-2 level 0 product in the ENVISAT format.
Bytes envisatProduct(uint64_t theRecords, const std::string& theProduct = "SAR_IM__0PWDDE19960322_000010_00000017A123_00234_04851_0000.E2")
{
    const auto block = [](const std::string& theLines, std::size_t theSize) {
        Bytes aBlock(theSize, ' ');
        std::copy(theLines.begin(), theLines.end(), aBlock.begin());
        aBlock.back() = '\n';
        return aBlock;
    };
    Bytes aFile = block("PRODUCT=\"" + theProduct + "\"\nPROC_CENTER=\"PDHS-K\"\nSOFTWARE_VER=\"PGS/6.3\"\n"
                        "SENSING_START=\"22-MAR-1996 00:00:10.250000\"\nSENSING_STOP=\"22-MAR-1996 00:00:27.250000\"\n"
                        "ABS_ORBIT=+04851\nSTATE_VECTOR_TIME=\"21-MAR-1996 23:58:30.000000\"\n"
                        "X_POSITION=-0001234567.890<m>\nY_POSITION=+0005234567.125<m>\nZ_POSITION=+0004234567.500<m>\n"
                        "X_VELOCITY=+0001234.567890<m/s>\nY_VELOCITY=-0002234.567890<m/s>\nZ_VELOCITY=+0007034.000000<m/s>\n"
                        "VECTOR_SOURCE=\"FP\"\nUTC_SBT_TIME=\"21-MAR-1996 23:59:50.109000\"\nSAT_BINARY_TIME=+2000000000\n"
                        "CLOCK_STEP=+3906250000<ps>\nSPH_SIZE=+0000001956<bytes>\nNUM_DSD=+0000000004\nDSD_SIZE=+0000000280<bytes>\n",
                        1247);
    append(aFile, block("SPH_DESCRIPTOR=\"SAR_IM__0P SPECIFIC HEADER\"\nTX_RX_POLAR=\"V/V\"\n", 836));
    const std::string aSize = std::to_string(theRecords * 11498);
    append(aFile, block("DS_NAME=\"SAR_SOURCE_PACKETS          \"\nDS_TYPE=M\nFILENAME=\"                              \"\n"
                        "DS_OFFSET=+00000000000000003203<bytes>\nDS_SIZE=+" + aSize + "<bytes>\nNUM_DSR=+" +
                            std::to_string(theRecords) + "\nDSR_SIZE=+0000011498<bytes>\n", 280));
    append(aFile, block("DS_NAME=\"ORBIT_STATE_VECTOR_FILE     \"\nDS_TYPE=R\n", 280));
    append(aFile, block("DS_NAME=\"SPARE\"\n", 280));
    append(aFile, block("DS_NAME=\"SPARE\"\n", 280));
    append(aFile, lineRecords(theRecords, 11498, 266, 54, false));
    return aFile;
}

/// The codes and the samples of every record come back as the fixture wrote them.
void expectRecords(const CNativeRecordLayout& theLayout, uint64_t theRecords)
{
    CNativeRecordFile aFile(theLayout);
    int aLastPercent = -1;
    const std::vector<CRecordCodes> aCodes = aFile.scan([&](int thePercent) { aLastPercent = thePercent; });
    ASSERT_EQ(aCodes.size(), theRecords);
    EXPECT_EQ(aLastPercent, 100);
    for (uint64_t i = 0; i < theRecords; ++i) {
        EXPECT_EQ(aCodes[i].mCounter, counterOf(i));
        EXPECT_EQ(aCodes[i].mClock, clockOf(i));
        EXPECT_EQ(aCodes[i].mSwst, 900);
        EXPECT_EQ(aCodes[i].mPri, 2820);
        EXPECT_TRUE(aCodes[i].mMarker);
    }
    Bytes aRecords(2 * theLayout.mRecordLength);
    aFile.read(theRecords - 2, 2, aRecords.data());
    for (int k : {0, 1, 2 * theLayout.mSamples - 1})
        EXPECT_EQ(aRecords[theLayout.mRecordLength + theLayout.mSamplesPos + static_cast<uint32_t>(k)], sampleOf(theRecords - 1, k));
}

/// Counter, clock, SWST, PRI, marker, block start.
std::array<int, 6> auxPositions(const CNativeRecordLayout& l)
{
    return {l.mCounterPos, l.mClockPos, l.mSwstPos, l.mPriPos, l.mMarkerPos, l.mAuxPos};
}

long day(int theYear, int theMonth, int theDay) { return fqorvDaysFromCivil(theYear, theMonth, theDay); }

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

TEST(ErsCeosReader, RealProductValuesReadBackThroughEveryEntry)
{
    qtest::TempDir aTemp;
    const fs::path aDir = CCeosFixture().write(aTemp / "product");
    for (const fs::path& aInput : {aDir, aDir / "a", aDir / "b"}) {
        SCOPED_TRACE(aInput.string());
        const CNativeArchive a = fqorvReadNativeArchive(aInput);
        EXPECT_EQ(a.mFormat, "ERS CEOS");
        EXPECT_EQ(a.mSensor, "ERS-2");
        EXPECT_EQ(a.mLayoutName, "PGS/VMP");
        EXPECT_EQ(a.mFacility, "D-PAF");
        EXPECT_EQ(a.mProcessor, "PGS-ERS");
        EXPECT_EQ(a.mOrbit, 4851);
        EXPECT_EQ(a.mPolarisation, "VV");
        EXPECT_DOUBLE_EQ(a.mPrf, 1679.9023438);
        EXPECT_DOUBLE_EQ(a.mWavelength, 0.0566660);
        EXPECT_DOUBLE_EQ(a.mChirpRate, 4.17788e11);
        EXPECT_DOUBLE_EQ(a.mSamplingRate, 18.9624680e6);
        EXPECT_DOUBLE_EQ(a.mPulseLength, 37.12e-6);
        EXPECT_TRUE(std::isnan(a.mIBias) && std::isnan(a.mQBias));
        EXPECT_DOUBLE_EQ(a.mCentreLongitude, 252.918 - 360.0);
        EXPECT_DOUBLE_EQ(a.mIncidenceDeg, 23.0);
        // Times count from the midnight before the binary time's UTC: the scene lies a day on.
        EXPECT_EQ(a.mReferenceDay, day(1996, 3, 21));
        EXPECT_EQ(a.mClock.mReferenceTicks, 2000000000u);
        EXPECT_NEAR(a.mClock.mReferenceTime, 86390.109, 1e-9);
        EXPECT_NEAR(a.mClock.timeOf(2000000000u + 401664u), 86390.109 + 1569.0, 1e-9);
        EXPECT_NEAR(a.mCentreTime, 86413.5, 1e-9);
        ASSERT_EQ(a.mStateVectors.size(), 5u);
        for (int k = 0; k < 5; ++k) {
            EXPECT_NEAR(a.mStateVectors[k].mTime, 86405.0 + 4.2 * k, 1e-9);
            EXPECT_EQ(a.mStateVectors[k].mPosition[1], 1000 * k + 1.5);
            EXPECT_EQ(a.mStateVectors[k].mVelocity[2], 1000 * k + 5.5);
        }
        const CNativeRecordLayout& l = a.mLayout;
        EXPECT_EQ(fs::canonical(l.mDataFile), fs::canonical(aDir / "b"));
        EXPECT_EQ(l.mFirstRecord, 11644u);
        EXPECT_EQ(l.mSamplesPos, 412u);
        EXPECT_EQ(l.mSamples, 5616);
        EXPECT_EQ(l.mRecords, 6u);
        EXPECT_FALSE(a.mTruncated);
        EXPECT_EQ(auxPositions(l), (std::array<int, 6>{210, 204, 214, 216, 202, 192}));
    }
    expectRecords(fqorvReadNativeArchive(aDir).mLayout, 6);
}

TEST(ErsCeosReader, FacilityLayoutsAreToldApartByTheirLengths)
{
    qtest::TempDir aTemp;
    for (const CVariant& v : {PGS, CVariant{11644, 416, 214, "CO"}, CVariant{11644, 410, 198, "EIC"},
                              CVariant{12060, 412, 200, "CCRS"}, CVariant{11474, 242, 200, "ASF"}}) {
        SCOPED_TRACE(v.mName);
        const CNativeArchive a = fqorvReadNativeArchive(CCeosFixture(v, 5).write(aTemp / v.mName) / "b");
        EXPECT_EQ(a.mLayoutName, v.mName);
        EXPECT_EQ(a.mLayout.mRecordLength, v.mLength);
        EXPECT_EQ(a.mLayout.mSamplesPos, static_cast<uint32_t>(v.mPrefix));
        EXPECT_EQ(a.mLayout.mCounterPos, v.mCounter);
        expectRecords(a.mLayout, 5);
    }
}

TEST(ErsCeosReader, TruncatedDataFileKeepsItsWholeLines)
{
    qtest::TempDir aTemp;
    CCeosFixture aFixture;
    putNumber(aFixture.mData, 236, 8, "29175");
    aFixture.mData.resize(aFixture.mData.size() - 5000);
    const CNativeArchive a = fqorvReadNativeArchive(aFixture.write(aTemp / "p"));
    EXPECT_TRUE(a.mTruncated);
    EXPECT_EQ(a.mLayout.mRecords, 5u);
    EXPECT_EQ(a.mLayout.mDeclaredRecords, 29175u);
    EXPECT_NE(::testing::PrintToString(a.mNotes).find("5 of 29175 declared lines"), std::string::npos);
}

TEST(ErsCeosReader, RefusalsNameWhatIsWrong)
{
    struct CCase {
        const char* mName;
        Bytes CCeosFixture::*mFile;
        std::function<void(Bytes&)> mEdit;
        const char* mInput;   // the file of the product given to the reader
        int mId;
        const char* mWords;
    };
    const auto leader = &CCeosFixture::mLeader;
    const auto data = &CCeosFixture::mData;
    const CCase aCases[] = {
        {"no leader beside", leader, [](Bytes& b) { b.clear(); }, "b", 979202, "no CEOS leader"},
        {"leader without summary", leader, [](Bytes& b) { b[DSS + 5] = 20; }, "b", 979202, "other CEOS files: a"},
        {"leader of RADARSAT", leader, [](Bytes& b) { putText(b, DSS + 396, 16, "RSAT-1"); }, "b", 979202, "RSAT-1"},
        {"ALOS leader", leader, [](Bytes& b) { putText(b, DSS + 396, 16, "ALOS"); }, "a", 261122, "no ALOS image file beside"},
        {"ALOS leader beside", leader, [](Bytes& b) { putText(b, DSS + 396, 16, "ALOS"); }, "b", 979202, "no ERS leader beside"},
        {"leader record cut", leader, [](Bytes& b) { putU32(b, PPR + 8, 5); }, "a", 979203, "record 4 at byte 4226 states a length of 5"},
        {"descriptor sums", data, [](Bytes& b) { putNumber(b, 248, 8, "5600"); }, "b", 979203, "make 11612"},
        {"lines beyond the records", data, [](Bytes& b) { putNumber(b, 248, 8, "6115"), putNumber(b, 288, 4, "-998"); }, "b",
         979203, "6115 samples per line and a suffix of -998 bytes"},
        {"first record's length", data, [](Bytes& b) { putU32(b, 11644 + 8, 11600); }, "b", 979203,
         "record 1 at byte 11644 states a length of 11600"},
        {"unknown layout", data, [](Bytes& b) { putNumber(b, 276, 4, "408"), putNumber(b, 248, 8, "5612"); }, "b", 979204,
         "records of 11644 bytes with a prefix of 420"},
        {"no marker", data, [](Bytes& b) { for (int i = 1; i <= 4; ++i) b[11644 * i + 202] = 0; }, "b", 979204,
         "missing in 4 of the first 6"},
        {"vectors going back", leader, [](Bytes& b) { putNumber(b, PPR + 182, 22, "-4.2"); }, "a", 979206, "-4.2"},
        {"inertial vectors", leader, [](Bytes& b) { putText(b, PPR + 204, 64, "Mean of date inertial"); }, "a", 979210, "inertial"},
        {"not raw samples", data, [](Bytes& b) { putText(b, 428, 4, "CI*4"); }, "b", 979201, "'CI*4'"},
        {"no whole line", data, [](Bytes& b) { b.resize(11644 + 11000); }, "b", 979209, "no whole record"},
        {"volume directory", data, [](Bytes&) {}, "c", 979201, "neither a leader nor a data file"},
        {"missing input", data, [](Bytes&) {}, "nothing", 261122, "does not exist"},
    };
    qtest::TempDir aTemp;
    for (const CCase& aCase : aCases) {
        SCOPED_TRACE(aCase.mName);
        CCeosFixture aFixture;
        aCase.mEdit(aFixture.*aCase.mFile);
        const fs::path aDir = aFixture.write(aTemp / aCase.mName);
        const auto [aId, aWords] = failureOf([&] { fqorvReadNativeArchive(aDir / aCase.mInput); });
        EXPECT_EQ(aId, aCase.mId) << aWords;
        EXPECT_NE(aWords.find(aCase.mWords), std::string::npos) << aWords;
    }

    // A record in the middle whose own length disagrees stops the scan.
    CCeosFixture aFixture;
    putU32(aFixture.mData, 11644 * 5 + 8, 11645);
    const CNativeArchive a = fqorvReadNativeArchive(aFixture.write(aTemp / "scan"));
    const auto [aId, aWords] = failureOf([&] { CNativeRecordFile(a.mLayout).scan(); });
    EXPECT_EQ(aId, 979203);
    EXPECT_NE(aWords.find("record 5 at byte 58220"), std::string::npos) << aWords;
}

TEST(CeosFields, AbsentFillersBlanksAndNumbers)
{
    Bytes aRecord = ceosRecord(1, {1, 2, 3, 4}, 12 + 6 * 16);
    const char* aTexts[] = {"-9999999.9", "-9999999.9999999", "", "12a", "1.5D3", " -0.258"};
    for (int i = 0; i < 6; ++i) putNumber(aRecord, static_cast<std::size_t>(12 + 16 * i), 16, aTexts[i]);
    const CCeosFields aFields(aRecord, "test record");
    for (int i = 0; i < 4; ++i) EXPECT_TRUE(std::isnan(aFields.real(12 + 16 * i, 16))) << aTexts[i];
    EXPECT_EQ(aFields.real(12 + 64, 16), 1500.0);
    EXPECT_EQ(aFields.real(12 + 80, 16), -0.258);
    EXPECT_FALSE(aFields.integer(12 + 32, 16).has_value());
    EXPECT_FALSE(aFields.integer(12 + 48, 16).has_value());
    EXPECT_EQ(failureOf([&] { aFields.real(100, 16); }).first, 979210);
}

TEST(EnvisatReader, ErsProductReadsBackAndItsTrapsAreRefused)
{
    qtest::TempDir aTemp;
    writeBytes(aTemp / "product", envisatProduct(4));
    const CNativeArchive a = fqorvReadNativeArchive(aTemp / "product");
    EXPECT_EQ(a.mFormat, "ERS ENVISAT format");
    EXPECT_EQ(a.mSensor, "ERS-2");
    EXPECT_EQ(a.mLayoutName, "ENVISAT format");
    EXPECT_EQ(a.mFacility, "PDHS-K");
    EXPECT_EQ(a.mProcessor, "PGS/6.3");
    EXPECT_EQ(a.mOrbit, 4851);
    EXPECT_EQ(a.mPolarisation, "VV");
    EXPECT_EQ(a.mReferenceDay, day(1996, 3, 21));
    EXPECT_EQ(a.mClock.mReferenceTicks, 2000000000u);
    EXPECT_NEAR(a.mClock.mReferenceTime, 86390.109, 1e-9);
    EXPECT_DOUBLE_EQ(a.mClock.mTickSeconds, 1.0 / 256.0);
    EXPECT_NEAR(a.mSensingStart, 86410.25, 1e-9);
    EXPECT_TRUE(std::isnan(a.mPrf) && std::isnan(a.mWavelength) && std::isnan(a.mSamplingRate));
    ASSERT_EQ(a.mStateVectors.size(), 1u);
    EXPECT_NEAR(a.mStateVectors[0].mTime, 86310.0, 1e-9);
    EXPECT_DOUBLE_EQ(a.mStateVectors[0].mPosition[0], -1234567.89);
    EXPECT_DOUBLE_EQ(a.mStateVectors[0].mVelocity[1], -2234.56789);
    EXPECT_EQ(a.mStateVectorSource, "main product header (FP)");
    const CNativeRecordLayout& l = a.mLayout;
    EXPECT_EQ(l.mFirstRecord, 3203u);
    EXPECT_EQ(l.mRecordLength, 11498u);
    EXPECT_EQ(l.mSamplesPos, 266u);
    EXPECT_EQ(l.mSamples, 5616);
    EXPECT_EQ(auxPositions(l), (std::array<int, 6>{54, 48, 58, 60, 46, 36}));
    expectRecords(l, 4);

    struct CCase {
        const char* mName;
        std::function<void(Bytes&)> mChange;
        int mId;
        const char* mWords;
    };
    const CCase aCases[] = {
        {"ASAR level 1", [](Bytes& b) { b = envisatProduct(2, "ASA_IMS_1PNPDE20040101_101010_000000162023_00123_09876_0001.N1"); }, 979201,
         "ASA_IMS_1PNPDE20040101_101010_000000162023_00123_09876_0001.N1, not raw data"},
        {"ISP length", [](Bytes& b) { putU16(b, 3203 + 24, 11400); }, 979203, "states a length of 11433"},
        {"truncated", [](Bytes& b) { b.resize(3203 + 11498 * 2 + 100); }, 0, ""},
        {"offset beyond 64 bits", [](Bytes& b) { replaceText(b, "+00000000000000003203", "+20000000000000003203"); }, 979210,
         "DS_OFFSET '+20000000000000003203' is not an integer"},
        {"descriptor counts beyond 64 bits", [](Bytes& b) {
             replaceText(b, "NUM_DSD=+0000000004", "NUM_DSD=+9999999999");
             replaceText(b, "DSD_SIZE=+0000000280", "DSD_SIZE=+9999999999");
         }, 979210, "9999999999 data set descriptors of 9999999999 bytes do not fit"},
        {"record count beyond 64 bits", [](Bytes& b) {
             replaceText(b, "NUM_DSR=+4\nDSR_SIZE=+0000011498<bytes>\n", "NUM_DSR=+1000000000000000\nDSR_SIZE=+0000011498<bytes>\n");
         }, 979203, "of 45992 bytes hold not 1000000000000000"},
    };
    for (const CCase& aCase : aCases) {
        SCOPED_TRACE(aCase.mName);
        Bytes aBytes = envisatProduct(4);
        aCase.mChange(aBytes);
        writeBytes(aTemp / aCase.mName, aBytes);
        const auto [aId, aWords] = failureOf([&] {
            const CNativeArchive aTruncated = fqorvReadNativeArchive(aTemp / aCase.mName);
            EXPECT_TRUE(aTruncated.mTruncated);
            EXPECT_EQ(aTruncated.mLayout.mRecords, 2u);
        });
        EXPECT_EQ(aId, aCase.mId) << aWords;
        EXPECT_NE(aWords.find(aCase.mWords), std::string::npos) << aWords;
    }
}
