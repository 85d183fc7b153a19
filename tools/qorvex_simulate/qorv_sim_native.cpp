#include "qorv_sim_native.h"

#include <algorithm>
#include <cctype>
#include <cstring>
#include <stdexcept>
#include <system_error>

#include "qorv_json.h"
#include "qorv_sim_ceos.h"
#include "qorv_sim_format.h"
#include "qorv_sim_geodesy.h"
#include "qorv_sim_orbit.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_truth.h"

namespace fs = std::filesystem;

namespace {

using namespace NQORV_SIM_CEOS;

// ------------------------------------------------------------------------------------------------
// CEOS records

constexpr CSimCeosVariant CQORV_SIM_CEOS_VARIANTS[] = {
    {"PGS/VMP", 11644, 412, 210}, {"CO", 11644, 416, 214}, {"EIC", 11644, 410, 198},
    {"CCRS", 12060, 412, 200},    {"ASF", 11474, 242, 200},
};

constexpr int CQORV_SIM_LEADER_FDR = 720;
constexpr int CQORV_SIM_DSS = 1886;
constexpr int CQORV_SIM_FACILITY = 12288;
constexpr int CQORV_SIM_VOLUME_RECORD = 360;

/// "DD-MMM-YYYY hh:mm:ss.uuuuuu": the ENVISAT format's date text.
std::string envisatDate(long theDay, double theSeconds)
{
    static const char* const aMonths[12] = {"JAN", "FEB", "MAR", "APR", "MAY", "JUN",
                                            "JUL", "AUG", "SEP", "OCT", "NOV", "DEC"};
    const CCivilTime c = civilTime(theDay, theSeconds, 1e-6);
    char aText[40];
    std::snprintf(aText, sizeof aText, "%02d-%s-%04d %02d:%02d:%02d.%06ld", c.mDay, aMonths[c.mMonth - 1], c.mYear,
                  c.mHour, c.mMinute, c.mSecond, c.mFraction);
    return aText;
}

bool isErs1(const CSimNativeProduct& p) { return p.mSensor == "ERS-1"; }

// ------------------------------------------------------------------------------------------------
// ERS CEOS

constexpr uint8_t CQORV_SIM_FDR_TYPES[4] = {63, 192, 18, 18};
constexpr uint8_t CQORV_SIM_DSS_TYPES[4] = {10, 10, 31, 20};
constexpr uint8_t CQORV_SIM_PLATFORM_TYPES[4] = {10, 30, 31, 20};
constexpr uint8_t CQORV_SIM_FACILITY_TYPES[4] = {10, 200, 31, 50};
constexpr uint8_t CQORV_SIM_SIGNAL_TYPES[4] = {50, 10, 31, 20};
constexpr uint8_t CQORV_SIM_VOLUME_TYPES[4] = {192, 192, 18, 18};
constexpr uint8_t CQORV_SIM_POINTER_TYPES[4] = {219, 192, 18, 18};
constexpr uint8_t CQORV_SIM_TEXT_TYPES[4] = {18, 63, 18, 18};
constexpr uint8_t CQORV_SIM_NULL_VOLUME_TYPES[4] = {192, 192, 63, 18};

const char* const CQORV_SIM_CEOS_FILES[4] = {"VDF_DAT.001", "LEA_01.001", "DAT_01.001", "NUL_DAT.001"};

uint32_t platformRecordLength(const CSimNativeProduct& p)
{
    const std::size_t n = std::max<std::size_t>(5, p.mStateVectors.size());
    return static_cast<uint32_t>(VECTOR_BASE + VECTOR_SIZE * n);
}

CRecord leaderDescriptor(const CSimNativeProduct& p)
{
    CRecord r = ceosRecord(1, CQORV_SIM_FDR_TYPES, CQORV_SIM_LEADER_FDR, true);
    putDescriptorHead(r, "LEA_01.001");
    // Counts and lengths of the leader's record kinds, in their fixed order from 180 on.
    for (int f = 180; f < 360; f += 12) {
        putI(r, f, 6, 0);
        putI(r, f + 6, 6, 0);
    }
    putI(r, 180, 6, 1);
    putI(r, 186, 6, CQORV_SIM_DSS);
    putI(r, 204, 6, 1);
    putI(r, 210, 6, platformRecordLength(p));
    putI(r, 420, 6, 2);
    putI(r, 426, 6, CQORV_SIM_FACILITY);
    return r;
}

CRecord dataSetSummary(const CSimNativeProduct& p)
{
    CRecord r = ceosRecord(2, CQORV_SIM_DSS_TYPES, CQORV_SIM_DSS, true);
    putI(r, 12, 4, 1);
    putI(r, 16, 4, 1);
    putA(r, 68, 32, std::isnan(p.mCentreTime) ? "" : ceosTime(p.mReferenceDay, p.mCentreTime));
    putF(r, 116, 16, p.mCentreLatitude);
    putF(r, 132, 16, p.mCentreLongitude < 0.0 ? p.mCentreLongitude + 360.0 : p.mCentreLongitude);
    putA(r, 396, 16, isErs1(p) ? "ERS1" : "ERS2");
    putA(r, 412, 32, "SAR- C-HR-IM-" + p.mPolarisation);
    putI(r, 444, 8, p.mOrbit);
    putF(r, 484, 8, p.mIncidenceDeg);
    putF(r, 500, 16, p.mWavelength);
    putA(r, 518, 16, "LINEAR FM CHIRP");
    // Phase coefficients of the chirp (constant, linear, quadratic): only the quadratic is stated.
    putF(r, 614, 16, 0.0);
    putF(r, 630, 16, 0.0);
    putF(r, 646, 16, 0.5 * p.mChirpRate);
    putF(r, 710, 16, p.mSamplingRate * 1e-6);
    putF(r, 726, 16, p.mRangeGateDelay * 1e6, "-9999999.9999999");
    putF(r, 742, 16, p.mPulseLength * 1e6);
    putF(r, 818, 16, p.mIBias);
    putF(r, 834, 16, p.mQBias);
    putF(r, 934, 16, p.mPrf);
    putI(r, 982, 16, p.mClock.mReferenceTicks);
    putA(r, 998, 32, std::isnan(p.mClock.mReferenceTime) ? "" : ceosTime(p.mReferenceDay, p.mClock.mReferenceTime));
    putA(r, 1046, 16, p.mFacility);
    putA(r, 1062, 8, p.mProcessor);
    return r;
}

std::vector<CRecord> volumeDirectory(const CSimNativeProduct& p)
{
    std::vector<CRecord> f;
    CRecord v = ceosRecord(1, CQORV_SIM_VOLUME_TYPES, CQORV_SIM_VOLUME_RECORD, true);
    putA(v, 12, 2, "A");
    putA(v, 16, 12, "CEOS-SAR-CCT");
    putA(v, 44, 16, isErs1(p) ? "ERS1-SAR-RAW" : "ERS2-SAR-RAW");
    f.push_back(v);
    const char* const aPointed[2] = {"LEA_01.001", "DAT_01.001"};
    for (int i = 0; i < 2; ++i) {
        CRecord q = ceosRecord(static_cast<uint32_t>(2 + i), CQORV_SIM_POINTER_TYPES, CQORV_SIM_VOLUME_RECORD, true);
        putA(q, 12, 2, "A");
        putI(q, 16, 4, i + 1);
        putA(q, 20, 16, aPointed[i]);
        f.push_back(q);
    }
    CRecord t = ceosRecord(4, CQORV_SIM_TEXT_TYPES, CQORV_SIM_VOLUME_RECORD, true);
    putA(t, 12, 2, "A");
    putA(t, 16, 40, "PRODUCT:" + p.mSensor + " SAR RAW");
    f.push_back(t);
    return f;
}

std::vector<CRecord> nullVolume()
{
    CRecord r = ceosRecord(1, CQORV_SIM_NULL_VOLUME_TYPES, CQORV_SIM_VOLUME_RECORD, true);
    putA(r, 12, 2, "A");
    putA(r, 16, 12, "CEOS-SAR-CCT");
    return {r};
}

CRecord dataDescriptor(const CSimNativeProduct& p, const CSimCeosVariant& v, long theLines)
{
    CRecord r = ceosRecord(1, CQORV_SIM_FDR_TYPES, v.mRecordLength, true);
    putDescriptorHead(r, "DAT_01.001");
    putI(r, 180, 6, theLines);
    putI(r, 186, 6, v.mRecordLength);
    putI(r, 216, 4, 8);
    putI(r, 220, 4, 2);
    putI(r, 224, 4, 2);
    putI(r, 232, 4, 1);
    putI(r, 236, 8, theLines);
    putI(r, 244, 4, 0);
    putI(r, 248, 8, p.mSamples);
    putI(r, 256, 4, 0);
    putI(r, 260, 4, 0);
    putI(r, 264, 4, 0);
    putA(r, 268, 4, "BSQ");
    putI(r, 272, 2, 1);
    putI(r, 274, 2, 1);
    putI(r, 276, 4, v.mPrefix - RECORD_HEADER);
    putI(r, 280, 8, 2LL * p.mSamples);
    putI(r, 288, 4, static_cast<long long>(v.mRecordLength) - v.mPrefix - 2LL * p.mSamples);
    putA(r, 400, 28, "COMPLEX UNSIGNED INTEGER");
    putA(r, 428, 4, "CI*2");
    return r;
}

/// The auxiliary block of a line around the image format counter at theCounter (CEOS and
/// ENVISAT format alike).
void putAuxiliary(uint8_t* theRecord, int theCounter, const CSimNativeLine& theLine)
{
    theRecord[theCounter + NQORV_SIM_AUX::PACKET_COUNTER] = theLine.mPacketCounter;
    theRecord[theCounter + NQORV_SIM_AUX::SUBCOMMUTATION] = theLine.mSubcommutation;
    theRecord[theCounter + NQORV_SIM_AUX::MARKER] = theLine.mMarker;
    fqorvSimPutBE32(theRecord + theCounter + NQORV_SIM_AUX::CLOCK, theLine.mClock);
    fqorvSimPutBE32(theRecord + theCounter, theLine.mCounter);
    fqorvSimPutBE16(theRecord + theCounter + NQORV_SIM_AUX::SWST, theLine.mSwst);
    fqorvSimPutBE16(theRecord + theCounter + NQORV_SIM_AUX::PRI, theLine.mPri);
}

class CCeosWriter : public CSimNativeWriter {
public:
    CCeosWriter(const CSimNativeProduct& theProduct, const fs::path& thePath)
        : mProduct(theProduct), mVariant(fqorvSimCeosVariant(theProduct.mLayout)), mPath(thePath), mPart(partOf(thePath))
    {
        if (mProduct.mSamples < 1 || mProduct.mSamples > mVariant.capacity())
            throw std::runtime_error(std::string("a ") + mVariant.mName + " line record holds 1 to " +
                                     std::to_string(mVariant.capacity()) + " samples, not " +
                                     std::to_string(mProduct.mSamples));
        if (mProduct.mStateVectors.size() < 2) throw std::runtime_error("a CEOS leader needs at least 2 state vectors");
        fs::remove_all(mPart);
        fs::create_directories(mPart);
        try {
            writeHeaders();
        } catch (...) {
            mData.reset();
            std::error_code e;
            fs::remove_all(mPart, e);
            throw;
        }
        mRecord = ceosRecord(0, CQORV_SIM_SIGNAL_TYPES, mVariant.mRecordLength, false);
        fqorvSimPutBE32(mRecord.data() + 24, static_cast<uint32_t>(mProduct.mSamples));
    }
    ~CCeosWriter() override
    {
        if (mFinished) return;
        mData.reset();
        std::error_code e;
        fs::remove_all(mPart, e);
    }

    void writeLine(const CSimNativeLine& theLine, const uint8_t* theSamples) override
    {
        if (mFinished) throw std::logic_error("a line written to a finished archive");
        uint8_t* r = mRecord.data();
        fqorvSimPutBE32(r, static_cast<uint32_t>(mRecords + 2));   // the descriptor is record 1
        fqorvSimPutBE32(r + 12, static_cast<uint32_t>(mRecords + 1));
        putAuxiliary(r, mVariant.mCounterPos, theLine);
        std::memcpy(r + mVariant.mPrefix, theSamples, 2 * static_cast<std::size_t>(mProduct.mSamples));
        mData->append(mRecord);
        ++mRecords;
    }

    fs::path finish() override
    {
        const long aLines = mProduct.mDeclaredLines >= 0 ? mProduct.mDeclaredLines : mRecords;
        const CRecord aDescriptor = dataDescriptor(mProduct, mVariant, aLines);
        mData->patch(0, aDescriptor.data(), aDescriptor.size());
        mData->close();
        mData.reset();
        clearDestination();
        fs::rename(mPart, mPath);
        mFinished = true;
        return mPath;
    }

private:
    /// The volume directory, the leader, the null volume and the data file's descriptor.
    void writeHeaders()
    {
        writeWhole(mPart / CQORV_SIM_CEOS_FILES[0], volumeDirectory(mProduct));
        writeWhole(mPart / CQORV_SIM_CEOS_FILES[1],
                   {leaderDescriptor(mProduct), dataSetSummary(mProduct),
                    platformPosition(3, CQORV_SIM_PLATFORM_TYPES, mProduct.mReferenceDay, mProduct.mStateVectors, 5),
                    ceosRecord(4, CQORV_SIM_FACILITY_TYPES, CQORV_SIM_FACILITY, true),
                    ceosRecord(5, CQORV_SIM_FACILITY_TYPES, CQORV_SIM_FACILITY, true)});
        writeWhole(mPart / CQORV_SIM_CEOS_FILES[3], nullVolume());
        mData = std::make_unique<CPartFile>(mPart / CQORV_SIM_CEOS_FILES[2]);
        mData->append(dataDescriptor(mProduct, mVariant, std::max(0L, mProduct.mDeclaredLines)));
    }

    /// Takes away the files of an earlier product under the same name; refuses a directory that
    /// holds anything else.
    void clearDestination() const
    {
        if (!fs::exists(mPath)) return;
        if (!fs::is_directory(mPath)) throw std::runtime_error(mPath.string() + " exists and is not a directory");
        for (const fs::directory_entry& e : fs::directory_iterator(mPath))
            if (std::find(std::begin(CQORV_SIM_CEOS_FILES), std::end(CQORV_SIM_CEOS_FILES), e.path().filename().string()) ==
                std::end(CQORV_SIM_CEOS_FILES))
                throw std::runtime_error(mPath.string() + " holds other files than a CEOS product: not replaced");
        fs::remove_all(mPath);
    }

    CSimNativeProduct mProduct;
    CSimCeosVariant mVariant;
    fs::path mPath, mPart;
    std::unique_ptr<CPartFile> mData;
    CRecord mRecord;
    bool mFinished = false;
};

// ------------------------------------------------------------------------------------------------
// ENVISAT format

/// KEY="text" with the text padded to theWidth.
std::string quoted(const char* theKey, const std::string& theText, std::size_t theWidth)
{
    std::string t = theText.substr(0, theWidth);
    t.resize(theWidth, ' ');
    return std::string(theKey) + "=\"" + t + "\"\n";
}

/// KEY=+000123<unit>: a signed whole number of theDigits digits.
std::string signedNumber(const char* theKey, long long theValue, int theDigits, const char* theUnit = "")
{
    char aText[64];
    std::snprintf(aText, sizeof aText, "%c%0*lld", theValue < 0 ? '-' : '+', theDigits, theValue < 0 ? -theValue : theValue);
    return std::string(theKey) + "=" + aText + theUnit + "\n";
}

/// KEY=+0001234.567<unit>: a signed fixed number of theWidth characters, sign included.
std::string signedFixed(const char* theKey, double theValue, int theWidth, int theDecimals, const char* theUnit)
{
    char aText[64];
    std::snprintf(aText, sizeof aText, "%+0*.*f", theWidth, theDecimals, theValue);
    return std::string(theKey) + "=" + aText + theUnit + "\n";
}

std::string blankLine(std::size_t theWidth) { return std::string(theWidth, ' ') + "\n"; }

/// Pads a header to theSize bytes with a line of blanks.
std::string padded(std::string theText, std::size_t theSize)
{
    if (theText.size() + 1 > theSize) throw std::runtime_error("a header text is longer than its place");
    if (theText.size() < theSize) theText += blankLine(theSize - theText.size() - 1);
    return theText;
}

std::string dataSetDescriptor(const char* theName, char theType, const std::string& theFile, unsigned long long theOffset,
                              unsigned long long theSize, long theCount, long theRecordSize)
{
    std::string d = quoted("DS_NAME", theName, 28);
    d += std::string("DS_TYPE=") + theType + "\n";
    d += quoted("FILENAME", theFile, 62);
    d += signedNumber("DS_OFFSET", static_cast<long long>(theOffset), 20, "<bytes>");
    d += signedNumber("DS_SIZE", static_cast<long long>(theSize), 20, "<bytes>");
    d += signedNumber("NUM_DSR", theCount, 10);
    d += signedNumber("DSR_SIZE", theRecordSize, 10, "<bytes>");
    return padded(d, NQORV_SIM_ENVISAT::DSD_SIZE);
}

/// The main product header: the product's identity, clock and first state vector.
std::string mainProductHeader(const CSimNativeProduct& p, const CSimEnvisatMph& m)
{
    const CStateVector v = p.mStateVectors.empty() ? CStateVector{} : p.mStateVectors.front();
    auto date = [&p](double t) { return envisatDate(p.mReferenceDay, t); };
    std::string h = quoted("PRODUCT", m.mName, 62);
    h += "PROC_STAGE=X\n";
    h += quoted("REF_DOC", "", 23);
    h += blankLine(40);
    h += quoted("ACQUISITION_STATION", p.mFacility, 20);
    h += quoted("PROC_CENTER", p.mFacility, 6);
    h += quoted("PROC_TIME", date(m.mStop), 27);
    h += quoted("SOFTWARE_VER", p.mProcessor, 14);
    h += blankLine(40);
    h += quoted("SENSING_START", date(m.mStart), 27);
    h += quoted("SENSING_STOP", date(m.mStop), 27);
    h += blankLine(40);
    h += "PHASE=X\n";
    h += signedNumber("CYCLE", 0, 3);
    h += signedNumber("REL_ORBIT", 0, 5);
    h += signedNumber("ABS_ORBIT", p.mOrbit, 5);
    h += quoted("STATE_VECTOR_TIME", p.mStateVectors.empty() ? "" : date(v.mTime), 27);
    h += "DELTA_UT1=+.000000<s>\n";
    const char* const aPos[3] = {"X_POSITION", "Y_POSITION", "Z_POSITION"};
    const char* const aVel[3] = {"X_VELOCITY", "Y_VELOCITY", "Z_VELOCITY"};
    for (int i = 0; i < 3; ++i) h += signedFixed(aPos[i], v.mPosition[i], 12, 3, "<m>");
    for (int i = 0; i < 3; ++i) h += signedFixed(aVel[i], v.mVelocity[i], 12, 6, "<m/s>");
    h += quoted("VECTOR_SOURCE", p.mStateVectors.empty() ? "" : p.mVectorSource, 2);
    h += blankLine(40);
    h += quoted("UTC_SBT_TIME", date(p.mClock.mReferenceTime), 27);
    h += signedNumber("SAT_BINARY_TIME", p.mClock.mReferenceTicks, 10);
    h += signedNumber("CLOCK_STEP", std::llround(p.mClock.mTickSeconds * 1e12), 10, "<ps>");
    h += blankLine(32);
    h += quoted("LEAP_UTC", "", 27);
    h += signedNumber("LEAP_SIGN", 0, 3);
    h += "LEAP_ERR=0\n";
    h += blankLine(40);
    h += "PRODUCT_ERR=0\n";
    h += signedNumber("TOT_SIZE", static_cast<long long>(m.mTotalSize), 20, "<bytes>");
    h += signedNumber("SPH_SIZE", m.mSphSize, 10, "<bytes>");
    h += signedNumber("NUM_DSD", m.mNumDsd, 10);
    h += signedNumber("DSD_SIZE", NQORV_SIM_ENVISAT::DSD_SIZE, 10, "<bytes>");
    h += signedNumber("NUM_DATA_SETS", m.mNumDataSets, 10);
    return padded(h, NQORV_SIM_ENVISAT::MPH_SIZE);
}

class CEnvisatWriter : public CSimNativeWriter {
public:
    CEnvisatWriter(const CSimNativeProduct& theProduct, const fs::path& thePath)
        : mProduct(theProduct), mPath(thePath), mPart(partOf(thePath))
    {
        if (mProduct.mSamples < 1 || mProduct.mSamples > NQORV_SIM_ENVISAT::SAMPLES)
            throw std::runtime_error("an ENVISAT-format ERS line holds 1 to 5616 samples, not " +
                                     std::to_string(mProduct.mSamples));
        if (mProduct.mStateVectors.empty()) throw std::runtime_error("the main product header needs a state vector");
        mFile = std::make_unique<CPartFile>(mPart);
        mFile->append(std::string(NQORV_SIM_ENVISAT::DATA_OFFSET, ' '));   // headers: written by finish()
        mRecord.assign(NQORV_SIM_ENVISAT::RECORD_SIZE, 0);
        // Samples a short line does not fill stand at the bias, alternating 15 and 16.
        for (int i = NQORV_SIM_ENVISAT::SAMPLES_POS; i < NQORV_SIM_ENVISAT::RECORD_SIZE; ++i)
            mRecord[static_cast<std::size_t>(i)] = static_cast<uint8_t>(15 + (i & 1));
        fqorvSimPutBE16(mRecord.data() + 24, NQORV_SIM_ENVISAT::ISP_LENGTH);
        mRecord[52] = NQORV_ERS::MARKER;   // activity: echo
    }
    ~CEnvisatWriter() override
    {
        if (mFinished) return;
        mFile.reset();
        std::error_code e;
        fs::remove(mPart, e);
    }

    void writeLine(const CSimNativeLine& theLine, const uint8_t* theSamples) override
    {
        if (mFinished) throw std::logic_error("a line written to a finished archive");
        const double t = std::isnan(theLine.mSensingTime) ? mProduct.mClock.timeOf(theLine.mClock) : theLine.mSensingTime;
        if (mRecords == 0) mFirstTime = t;
        mLastTime = t;
        uint8_t* r = mRecord.data();
        putSensingTime(r, t);
        fqorvSimPutBE32(r + 32, theLine.mRecordNumber);
        putAuxiliary(r, NQORV_SIM_ENVISAT::COUNTER_POS, theLine);
        std::memcpy(r + NQORV_SIM_ENVISAT::SAMPLES_POS, theSamples, 2 * static_cast<std::size_t>(mProduct.mSamples));
        mFile->append(mRecord);
        ++mRecords;
    }

    fs::path finish() override
    {
        const long aCount = mProduct.mDeclaredLines >= 0 ? mProduct.mDeclaredLines : mRecords;
        const double aStart = std::isnan(mProduct.mSensingStart) ? mFirstTime : mProduct.mSensingStart;
        const double aStop = std::isnan(mProduct.mSensingStop) ? mLastTime : mProduct.mSensingStop;
        const std::string aHeaders = mainHeader(aCount, aStart, aStop) + specificHeader(aCount);
        mFile->patch(0, aHeaders);
        mFile->close();
        mFile.reset();
        fs::rename(mPart, mPath);
        mFinished = true;
        return mPath;
    }

private:
    void putSensingTime(uint8_t* r, double t) const { fqorvSimPutMjd2000(r, mProduct.mReferenceDay, t); }

    std::string mainHeader(long theCount, double theStart, double theStop) const
    {
        CSimEnvisatMph m;
        m.mName = fqorvSimEnvisatProductName(mProduct, theStart, theStop);
        m.mStart = theStart;
        m.mStop = theStop;
        m.mTotalSize =
            NQORV_SIM_ENVISAT::DATA_OFFSET + static_cast<unsigned long long>(theCount) * NQORV_SIM_ENVISAT::RECORD_SIZE;
        return mainProductHeader(mProduct, m);
    }

    std::string specificHeader(long theCount) const
    {
        const CSimNativeProduct& p = mProduct;
        const long long aLat = std::isnan(p.mCentreLatitude) ? 0 : std::llround(p.mCentreLatitude * 1e6);
        const long long aLon = std::isnan(p.mCentreLongitude) ? 0 : std::llround(p.mCentreLongitude * 1e6);
        std::string h = quoted("SPH_DESCRIPTOR", "SAR_IM__0P SPECIFIC HEADER", 28);
        h += signedNumber("START_LAT", aLat, 10, "<10-6degN>");
        h += signedNumber("START_LONG", aLon, 10, "<10-6degE>");
        h += signedNumber("STOP_LAT", aLat, 10, "<10-6degN>");
        h += signedNumber("STOP_LONG", aLon, 10, "<10-6degE>");
        h += blankLine(50);
        for (const char* k : {"ISP_ERRORS_SIGNIFICANT", "MISSING_ISPS_SIGNIFICANT", "ISP_DISCARDED_SIGNIFICANT",
                              "RS_SIGNIFICANT"})
            h += std::string(k) + "=0\n";
        h += blankLine(50);
        for (const char* k : {"NUM_ERROR_ISPS", "NUM_DISCARDED_ISPS", "NUM_MISSING_ISPS", "NUM_RS_ISPS"})
            h += signedNumber(k, 0, 10);
        h += blankLine(50);
        std::string aPolar = p.mPolarisation;
        if (aPolar.size() == 2) aPolar = aPolar.substr(0, 1) + "/" + aPolar.substr(1);
        h += quoted("TX_RX_POLAR", aPolar, 3);
        h += quoted("SWATH", "", 3);
        h = padded(h, NQORV_SIM_ENVISAT::SPH_FIXED);
        const unsigned long long aSize = static_cast<unsigned long long>(theCount) * NQORV_SIM_ENVISAT::RECORD_SIZE;
        h += dataSetDescriptor("SAR_SOURCE_PACKETS", 'M', "", NQORV_SIM_ENVISAT::DATA_OFFSET, aSize, theCount,
                               NQORV_SIM_ENVISAT::RECORD_SIZE);
        h += dataSetDescriptor("ORBIT_STATE_VECTOR_FILE", 'R', "NOT USED", 0, 0, 0, 0);
        h += padded("", NQORV_SIM_ENVISAT::DSD_SIZE);
        h += padded("", NQORV_SIM_ENVISAT::DSD_SIZE);
        return h;
    }

    CSimNativeProduct mProduct;
    fs::path mPath, mPart;
    std::unique_ptr<CPartFile> mFile;
    CRecord mRecord;
    double mFirstTime = NAN, mLastTime = NAN;
    bool mFinished = false;
};

}  // namespace

const CSimCeosVariant& fqorvSimCeosVariant(CSimCeosLayout theLayout)
{
    return CQORV_SIM_CEOS_VARIANTS[static_cast<int>(theLayout)];
}

bool fqorvSimParseCeosLayout(const std::string& theName, CSimCeosLayout& theLayout)
{
    std::string n = theName;
    std::transform(n.begin(), n.end(), n.begin(), [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    if (n == "pgs" || n == "vmp" || n == "pgs/vmp") theLayout = CSimCeosLayout::PgsVmp;
    else if (n == "co") theLayout = CSimCeosLayout::Co;
    else if (n == "eic") theLayout = CSimCeosLayout::Eic;
    else if (n == "ccrs") theLayout = CSimCeosLayout::Ccrs;
    else if (n == "asf") theLayout = CSimCeosLayout::Asf;
    else return false;
    return true;
}

std::unique_ptr<CSimNativeWriter> fqorvSimOpenNativeWriter(CSimNativeFormat theFormat, const CSimNativeProduct& theProduct,
                                                           const fs::path& thePath)
{
    if (theFormat == CSimNativeFormat::Ceos) return std::make_unique<CCeosWriter>(theProduct, thePath);
    return std::make_unique<CEnvisatWriter>(theProduct, thePath);
}

std::string fqorvSimEnvisatName(const std::string& theType, const CSimNativeProduct& theProduct, double theStart,
                                double theStop, const std::string& theExtension)
{
    const CCivilTime c = civilTime(theProduct.mReferenceDay, theStart, 1.0);
    // The originator: the first three letters or digits of the facility.
    std::string aCentre;
    for (char ch : theProduct.mFacility)
        if (std::isalnum(static_cast<unsigned char>(ch)) && aCentre.size() < 3)
            aCentre += static_cast<char>(std::toupper(static_cast<unsigned char>(ch)));
    aCentre.resize(3, 'X');
    const long aDuration = std::max(0L, static_cast<long>(std::ceil(theStop - theStart)));
    char aName[96];
    std::snprintf(aName, sizeof aName, "%.10sX%s%04d%02d%02d_%02d%02d%02d_%08ldX000_00000_%05d_0000%s", theType.c_str(),
                  aCentre.c_str(), c.mYear, c.mMonth, c.mDay, c.mHour, c.mMinute, c.mSecond, aDuration,
                  theProduct.mOrbit % 100000, theExtension.c_str());
    return aName;
}

std::string fqorvSimEnvisatProductName(const CSimNativeProduct& theProduct, double theSensingStart, double theSensingStop)
{
    return fqorvSimEnvisatName("SAR_IM__0P", theProduct, theSensingStart, theSensingStop,
                               isErs1(theProduct) ? ".E1" : ".E2");
}

std::string fqorvSimEnvisatDate(long theDay, double theSeconds) { return envisatDate(theDay, theSeconds); }

std::string fqorvSimEnvisatText(const char* theKey, const std::string& theText, std::size_t theWidth)
{
    return quoted(theKey, theText, theWidth);
}

std::string fqorvSimEnvisatNumber(const char* theKey, long long theValue, int theDigits, const char* theUnit)
{
    return signedNumber(theKey, theValue, theDigits, theUnit);
}

std::string fqorvSimEnvisatPadded(const std::string& theText, std::size_t theSize) { return padded(theText, theSize); }

std::string fqorvSimEnvisatDescriptor(const char* theName, char theType, const std::string& theFile,
                                      unsigned long long theOffset, unsigned long long theSize, long theCount,
                                      long theRecordSize)
{
    return dataSetDescriptor(theName, theType, theFile, theOffset, theSize, theCount, theRecordSize);
}

std::string fqorvSimEnvisatMainHeader(const CSimNativeProduct& theProduct, const CSimEnvisatMph& theHeader)
{
    return mainProductHeader(theProduct, theHeader);
}

void fqorvSimPutMjd2000(uint8_t* theOut, long theDay, double theSeconds)
{
    const CCivilTime c = civilTime(theDay, theSeconds, 1e-6);
    fqorvSimPutBE32(theOut, static_cast<uint32_t>(static_cast<int32_t>(c.mDayNumber - NQORV_SIM_ENVISAT::MJD2000_DAY)));
    fqorvSimPutBE32(theOut + 4, static_cast<uint32_t>(c.mSecondOfDay));
    fqorvSimPutBE32(theOut + 8, static_cast<uint32_t>(c.mFraction));
}

// ------------------------------------------------------------------------------------------------
// The simulator's scenes

namespace {

constexpr uint32_t CQORV_SIM_CLOCK_REFERENCE_TICKS = 1930000000u;
constexpr double CQORV_SIM_CLOCK_LEAD = 1500.0;   // s from the clock's reference pair to the first pulse
constexpr long CQORV_SIM_CLOCK_LATCH = 4;         // the on-board time is latched every fourth pulse
constexpr uint32_t CQORV_SIM_COUNTER_MASK = (1u << NQORV_ERS::COUNTER_BITS) - 1;

/// Seconds from the midnight of the scene's epoch day of a scene time (s from the epoch).
double dayTime(const CSimScene& s, double t) { return s.mEpoch.mSeconds + t; }
/// ... and back.
double sceneTime(const CSimScene& s, double theDayTime) { return theDayTime - s.mEpoch.mSeconds; }

double wholeMs(double t, bool theUp) { return (theUp ? std::ceil(t * 1000.0) : std::floor(t * 1000.0)) / 1000.0; }

/// An absolute orbit number of the right size for the date: orbits since launch at 501 orbits in
/// the 35-day repeat cycle. Not a real orbit.
int plausibleOrbit(const CSimScene& s)
{
    const bool aErs1 = s.mRadar.mSensorName == "ERS-1";
    const long aLaunch = aErs1 ? fqorvSimDaysFromCivil(1991, 7, 17) : fqorvSimDaysFromCivil(1995, 4, 21);
    const double aDays = static_cast<double>(s.mEpoch.mDay - aLaunch) + s.mEpoch.mSeconds / 86400.0;
    return 1 + static_cast<int>(std::max(0.0, aDays) * 501.0 / 35.0);
}

CStateVector stateVector(const CSimScene& s, const CSimOrbit& theOrbit, double theDayTime)
{
    return fqorvSimStateVector(theOrbit.state(sceneTime(s, theDayTime)), theDayTime);
}

/// CEOS: five vectors on whole milliseconds, the middle three spanning the scene, one of margin
/// at each end (at least 1 s apart). ENVISAT format: one at the scene centre's time to the us.
std::vector<CStateVector> sceneVectors(const CSimScene& s, const CSimTimeline& tl, const CSimOrbit& theOrbit,
                                       const CSimSceneTruth& theTruth)
{
    std::vector<CStateVector> v;
    if (s.mArchive == CSimArchive::Envisat) {
        const double tc = std::round(dayTime(s, theTruth.mCentreZeroDopplerTime) * 1e6) / 1e6;
        v.push_back(stateVector(s, theOrbit, tc));
        return v;
    }
    const double aStart = dayTime(s, tl.pulseTime(0)), aStop = dayTime(s, tl.pulseTime(s.mPulses - 1));
    const double aStep = wholeMs(std::max(0.5 * (aStop - aStart), 1.0), true);
    const double aFirst = wholeMs(aStart - aStep, false);
    for (int i = 0; i < 5; ++i) v.push_back(stateVector(s, theOrbit, aFirst + i * aStep));
    return v;
}

/// The value a garbage fault writes into a line.
void applyGarbage(const CSimGarbage& g, CSimNativeLine& l)
{
    const bool aDefault = g.mValue < 0;
    const auto v = static_cast<uint32_t>(g.mValue);
    switch (g.mField) {
    case CSimGarbageField::Pri: l.mPri = aDefault ? 0 : static_cast<uint16_t>(v); break;
    case CSimGarbageField::Swst: l.mSwst = aDefault ? 4095 : static_cast<uint16_t>(v); break;
    case CSimGarbageField::Counter:
        l.mCounter = aDefault ? (l.mCounter + (1u << (NQORV_ERS::COUNTER_BITS - 1))) & CQORV_SIM_COUNTER_MASK : v;
        break;
    case CSimGarbageField::Clock: l.mClock = aDefault ? l.mClock ^ 0x5A5A5A5Au : v; break;
    case CSimGarbageField::Marker: l.mMarker = aDefault ? 0 : static_cast<uint8_t>(v); break;
    }
}

uint32_t fieldOf(const CSimNativeLine& l, CSimGarbageField theField)
{
    switch (theField) {
    case CSimGarbageField::Pri: return l.mPri;
    case CSimGarbageField::Swst: return l.mSwst;
    case CSimGarbageField::Counter: return l.mCounter;
    case CSimGarbageField::Clock: return l.mClock;
    case CSimGarbageField::Marker: return l.mMarker;
    }
    return 0;
}


}  // namespace

CNativeClock fqorvSimSceneClock(const CSimScene& theScene, const CSimTimeline& theTimeline)
{
    CNativeClock c;
    // A whole millisecond is a tick edge of its own clock: the edges fall at it plus k / 256 s.
    c.mReferenceTime = wholeMs(dayTime(theScene, theTimeline.pulseTime(0)) - CQORV_SIM_CLOCK_LEAD, false);
    c.mReferenceTicks = CQORV_SIM_CLOCK_REFERENCE_TICKS;
    c.mTickSeconds = NQORV_ERS::CLOCK_TICK;
    return c;
}

uint32_t fqorvSimClockTicks(const CNativeClock& theClock, double theTime)
{
    const auto aTicks = static_cast<int64_t>(std::floor((theTime - theClock.mReferenceTime) / theClock.mTickSeconds));
    return theClock.mReferenceTicks + static_cast<uint32_t>(aTicks);
}

CSimNativeProduct fqorvSimSceneProduct(const CSimScene& s, const CSimTimeline& tl, const CSimOrbit& theOrbit,
                                       const CSimSceneTruth& theTruth)
{
    CSimNativeProduct p;
    const CSimRadar& r = s.mRadar;
    p.mSensor = r.mSensorName;
    p.mLayout = s.mCeosLayout;
    if (s.mArchive == CSimArchive::Ceos && s.mCeosLayout != CSimCeosLayout::PgsVmp) {
        p.mFacility = fqorvSimCeosVariant(s.mCeosLayout).mName;
        p.mProcessor = "SIM";
    }
    p.mOrbit = plausibleOrbit(s);
    p.mPolarisation = r.mPolarisation;
    p.mReferenceDay = s.mEpoch.mDay;
    p.mSamples = s.mSamples;
    p.mWavelength = r.wavelength();
    p.mChirpRate = r.chirpRate();
    p.mSamplingRate = r.mSamplingRate;
    p.mPulseLength = r.mPulseLength;
    p.mPrf = fqorvSimPrfOfCode(s.mPrefix, r.mSamplingRate, r.mPriCode);
    p.mCentreTime = dayTime(s, theTruth.mCentreZeroDopplerTime);
    p.mCentreLatitude = theTruth.mCentreLat;
    p.mCentreLongitude = theTruth.mCentreLon;
    p.mIncidenceDeg = theTruth.mIncidenceDeg;
    p.mClock = fqorvSimSceneClock(s, tl);
    p.mStateVectors = sceneVectors(s, tl, theOrbit, theTruth);
    return p;
}

CSimNativeLine fqorvSimSceneLine(const CSimScene& theScene, const CSimTimeline& theTimeline, const CNativeClock& theClock,
                                 const CSimRecord& theRecord)
{
    const long k = theRecord.mPulse;
    CSimNativeLine l;
    l.mCounter = theRecord.mCounter & CQORV_SIM_COUNTER_MASK;
    const long aLatched = k - k % CQORV_SIM_CLOCK_LATCH;
    l.mClock = fqorvSimClockTicks(theClock, dayTime(theScene, theTimeline.pulseTime(aLatched)));
    l.mSwst = static_cast<uint16_t>(theTimeline.swstCode(k));
    l.mPri = static_cast<uint16_t>(theTimeline.priCode(k));
    l.mPacketCounter = static_cast<uint8_t>(k);
    l.mRecordNumber = static_cast<uint32_t>(k + 1);
    for (const CSimGarbage& g : theScene.mFaults.mGarbage)
        if (g.mPulse == k) applyGarbage(g, l);
    return l;
}

fs::path fqorvSimArchivePath(const CSimScene& theScene, const std::string& theRoot)
{
    if (theScene.mArchive == CSimArchive::Envisat)
        return theRoot + (theScene.mRadar.mSensorName == "ERS-1" ? ".E1" : ".E2");
    return theRoot;
}

void fqorvSimAddArchiveTruth(CJson& theTruth, const CSimScene& s, const CSimTimeline& tl, const CSimNativeProduct& p,
                             const fs::path& theArchive)
{
    const bool aCeos = s.mArchive == CSimArchive::Ceos;
    const CSimCeosVariant& v = fqorvSimCeosVariant(s.mCeosLayout);
    CJson a = CJson::object();
    a["format"] = aCeos ? "ERS CEOS" : "ERS ENVISAT format";
    a["layout"] = aCeos ? v.mName : "ENVISAT format";
    a["path"] = theArchive.filename().string();
    a["data_file"] = aCeos ? "DAT_01.001" : theArchive.filename().string();
    a["first_record"] = aCeos ? static_cast<long>(v.mRecordLength) : static_cast<long>(NQORV_SIM_ENVISAT::DATA_OFFSET);
    a["record_length"] = aCeos ? static_cast<long>(v.mRecordLength) : static_cast<long>(NQORV_SIM_ENVISAT::RECORD_SIZE);
    a["samples_pos"] = aCeos ? v.mPrefix : NQORV_SIM_ENVISAT::SAMPLES_POS;
    a["counter_pos"] = aCeos ? v.mCounterPos : NQORV_SIM_ENVISAT::COUNTER_POS;
    a["counter_bits"] = NQORV_ERS::COUNTER_BITS;
    a["orbit"] = p.mOrbit;

    CJson& c = a["clock"] = CJson::object();
    c["reference_time"] = sceneTime(s, p.mClock.mReferenceTime);
    c["reference_utc"] = fqorvSimIsoDate(CSimUtc{s.mEpoch.mDay, 0.0}.plus(p.mClock.mReferenceTime));
    c["reference_ticks"] = static_cast<long long>(p.mClock.mReferenceTicks);
    c["tick_seconds"] = p.mClock.mTickSeconds;
    c["latch_pulses"] = CQORV_SIM_CLOCK_LATCH;
    c["definition"] = "ticks of pulse n = reference_ticks + floor((t_m - reference_time) / tick), t_m the transmit "
                      "time of the latest pulse m <= n with m a multiple of latch_pulses";

    CJson& w = a["window"] = CJson::object();
    w["rank"] = NQORV_ERS::RANK;
    w["delay_bias"] = NQORV_ERS::DELAY_BIAS;
    w["swst_unit"] = NQORV_ERS::SWST_SAMPLES_PER_CODE / s.mRadar.mSamplingRate;
    w["definition"] = "tau = swst_code * swst_unit + rank / PRF - delay_bias";
    a["state_vectors"] = fqorvSimVectorsJson(p.mStateVectors, s.mEpoch.mSeconds, aCeos ? "leader" : "main product header (FP)");
    theTruth["archive"] = a;
    theTruth["raster"]["file"] = theArchive.filename().string();
    theTruth["raster"]["header"] = CJson();

    CJson aGarbage = CJson::array();
    for (const CSimGarbage& g : s.mFaults.mGarbage) {
        const long aRecord = tl.recordOfPulse(g.mPulse);
        const CSimNativeLine l = fqorvSimSceneLine(s, tl, p.mClock, tl.records()[static_cast<std::size_t>(aRecord)]);
        CJson e = CJson::object();
        e["pulse"] = g.mPulse;
        e["record"] = aRecord;
        e["field"] = fqorvSimGarbageName(g.mField);
        e["value"] = static_cast<long long>(fieldOf(l, g.mField));
        aGarbage.push(e);
    }
    theTruth["events"]["garbage"] = aGarbage;
}

CStateVector fqorvSimStateVector(const CSimState& theState, double theTime)
{
    CStateVector v;
    v.mTime = theTime;
    const double aPos[3] = {theState.mPos.x, theState.mPos.y, theState.mPos.z};
    const double aVel[3] = {theState.mVel.x, theState.mVel.y, theState.mVel.z};
    for (int i = 0; i < 3; ++i) {
        v.mPosition[i] = aPos[i];
        v.mVelocity[i] = aVel[i];
    }
    return v;
}

CJson fqorvSimVectorsJson(const std::vector<CStateVector>& theVectors, double theOffset, const std::string& theSource)
{
    CJson aTimes = CJson::array(), aPos = CJson::array(), aVel = CJson::array();
    for (const CStateVector& v : theVectors) {
        aTimes.push(CJson(v.mTime - theOffset));
        aPos.push(CJson(std::vector<double>{v.mPosition[0], v.mPosition[1], v.mPosition[2]}));
        aVel.push(CJson(std::vector<double>{v.mVelocity[0], v.mVelocity[1], v.mVelocity[2]}));
    }
    CJson j = CJson::object();
    j["source"] = theSource;
    j["times"] = aTimes;
    j["pos"] = aPos;
    j["vel"] = aVel;
    return j;
}
