#include "qorv_sim_alos.h"

#include <algorithm>
#include <cstring>
#include <stdexcept>
#include <system_error>

#include "qorv_json.h"
#include "qorv_sim_ceos.h"
#include "qorv_sim_format.h"
#include "qorv_sim_geodesy.h"
#include "qorv_sim_native.h"
#include "qorv_sim_orbit.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"
#include "qorv_sim_truth.h"

namespace fs = std::filesystem;
using namespace NQORV_SIM_CEOS;

namespace {

constexpr uint8_t CQORV_SIM_ALOS_LEADER_FDR_TYPES[4] = {11, 192, 18, 18};
constexpr uint8_t CQORV_SIM_ALOS_DSS_TYPES[4] = {10, 10, 18, 20};
constexpr uint8_t CQORV_SIM_ALOS_PLATFORM_TYPES[4] = {10, 30, 18, 20};
constexpr uint8_t CQORV_SIM_ALOS_CALIBRATION_TYPES[4] = {10, 130, 18, 20};
constexpr uint8_t CQORV_SIM_ALOS_IMAGE_FDR_TYPES[4] = {63, 192, 18, 18};
constexpr uint8_t CQORV_SIM_ALOS_SIGNAL_TYPES[4] = {50, 10, 50, 18};
constexpr uint32_t CQORV_SIM_ALOS_FDR = 720;
constexpr uint32_t CQORV_SIM_ALOS_DSS = 4096;
constexpr uint32_t CQORV_SIM_ALOS_CALIBRATION = 4096;
constexpr int CQORV_SIM_ALOS_PREFIX = 412;
constexpr double CQORV_SIM_ALOS_VECTOR_STEP = 60.0;   // s between the leader's state vectors
constexpr double CQORV_SIM_ALOS_VECTOR_MARGIN = 120.0;
constexpr double CQORV_SIM_LIGHT = 299792458.0;

bool isFbs(const CSimAlosProduct& p) { return std::fabs(p.mSamplingRate - 32e6) < 0.5e6; }

uint32_t recordLength(const CSimAlosProduct& p)
{
    return static_cast<uint32_t>(CQORV_SIM_ALOS_PREFIX + 2 * (p.mSamples + p.mRightFill));
}

/// A whole number as an I4 field of the calibration record, blank when theValue is not one.
void putWhole(CRecord& r, int theOffset, double theValue)
{
    if (std::isfinite(theValue) && std::fabs(theValue - std::round(theValue)) < 1e-9) putI(r, theOffset, 4, std::llround(theValue));
}

std::vector<CRecord> leaderRecords(const CSimAlosProduct& p)
{
    CRecord aFdr = ceosRecord(1, CQORV_SIM_ALOS_LEADER_FDR_TYPES, CQORV_SIM_ALOS_FDR, true);
    putDescriptorHead(aFdr, "LED");

    CRecord d = ceosRecord(2, CQORV_SIM_ALOS_DSS_TYPES, CQORV_SIM_ALOS_DSS, true);
    putA(d, 68, 32, std::isnan(p.mCentreTime) ? "" : ceosTime(p.mReferenceDay, p.mCentreTime));
    putF(d, 116, 16, p.mCentreLatitude);
    putF(d, 132, 16, p.mCentreLongitude);
    putA(d, 396, 16, "ALOS");
    putA(d, 412, 32, p.mSensorText.empty() ? std::string("ALOS-PALSAR-") + (isFbs(p) ? "FBS" : "FBD") : p.mSensorText);
    putI(d, 444, 8, p.mOrbit);
    putF(d, 484, 8, p.mIncidenceDeg);
    putF(d, 500, 16, p.mWavelength);
    putA(d, 518, 16, "LINEAR FM CHIRP");
    putF(d, 710, 16, p.mSamplingRate * 1e-6);
    putF(d, 742, 16, p.mPulseLength * 1e6);
    putF(d, 818, 16, p.mIBias);
    putF(d, 834, 16, p.mQBias);
    putF(d, 934, 16, p.mPrf * 1e3);
    putA(d, 1046, 16, p.mFacility);
    putA(d, 1062, 8, p.mProcessor);
    putI(d, 1802, 4, p.mPrfSwitchLine >= 0 ? 1 : 0);
    putI(d, 1806, 8, std::max(0LL, p.mPrfSwitchLine));

    CRecord c = ceosRecord(4, CQORV_SIM_ALOS_CALIBRATION_TYPES, CQORV_SIM_ALOS_CALIBRATION, true);
    putWhole(c, 60, p.mPulseLength * 1e6);
    putWhole(c, 64, p.mBandwidth * 1e-6);
    putWhole(c, 68, p.mSamplingRate * 1e-6);
    return {aFdr, d, platformPosition(3, CQORV_SIM_ALOS_PLATFORM_TYPES, p.mReferenceDay, p.mStateVectors, 1), c};
}

CRecord imageDescriptor(const CSimAlosProduct& p, const std::string& thePolarisation, long theLines)
{
    CRecord r = ceosRecord(1, CQORV_SIM_ALOS_IMAGE_FDR_TYPES, CQORV_SIM_ALOS_FDR, true);
    putDescriptorHead(r, ("IMG-" + thePolarisation).c_str());
    putI(r, 180, 6, theLines);
    putI(r, 186, 6, recordLength(p));
    putI(r, 216, 4, 8);
    putI(r, 220, 4, 2);
    putI(r, 224, 4, 2);
    putI(r, 236, 8, theLines);
    putI(r, 248, 8, p.mSamples);
    putI(r, 276, 4, CQORV_SIM_ALOS_PREFIX - RECORD_HEADER);
    putI(r, 280, 8, 2LL * p.mSamples);
    putI(r, 288, 4, 2LL * p.mRightFill);
    putA(r, 400, 28, "COMPLEX UNSIGNED INTEGER");
    putA(r, 428, 4, "CI*2");
    return r;
}

}  // namespace

struct CSimAlosWriter::CFiles {
    std::vector<std::unique_ptr<CPartFile>> mImages;
    CRecord mRecord;
};

std::string CSimAlosWriter::leaderName(const CSimAlosProduct& theProduct) { return "LED-" + theProduct.mSceneId; }

std::string CSimAlosWriter::imageName(const CSimAlosProduct& theProduct, const std::string& thePolarisation)
{
    return "IMG-" + thePolarisation + "-" + theProduct.mSceneId;
}

CSimAlosWriter::CSimAlosWriter(const CSimAlosProduct& theProduct, const fs::path& theDirectory)
    : mProduct(theProduct), mPath(theDirectory), mPart(partOf(theDirectory)), mFiles(std::make_unique<CFiles>())
{
    if (mProduct.mSamples < 1 || mProduct.mRightFill < 0) throw std::runtime_error("an ALOS line needs data pixels");
    if (mProduct.mStateVectors.size() < 2) throw std::runtime_error("an ALOS leader needs at least 2 state vectors");
    if (mProduct.mPolarisations.empty()) throw std::runtime_error("an ALOS product needs a polarisation");
    fs::remove_all(mPart);
    fs::create_directories(mPart);
    try {
        writeWhole(mPart / leaderName(mProduct), leaderRecords(mProduct));
        for (const std::string& aPol : mProduct.mPolarisations) {
            mFiles->mImages.push_back(std::make_unique<CPartFile>(mPart / imageName(mProduct, aPol)));
            mFiles->mImages.back()->append(imageDescriptor(mProduct, aPol, std::max(0L, mProduct.mDeclaredLines)));
        }
    } catch (...) {
        mFiles.reset();
        std::error_code e;
        fs::remove_all(mPart, e);
        throw;
    }
    mFiles->mRecord = ceosRecord(0, CQORV_SIM_ALOS_SIGNAL_TYPES, recordLength(mProduct), false);
    uint8_t* r = mFiles->mRecord.data();
    fqorvSimPutBE32(r + 24, static_cast<uint32_t>(mProduct.mSamples));
    fqorvSimPutBE32(r + 28, static_cast<uint32_t>(mProduct.mRightFill));
    fqorvSimPutBE32(r + 68, static_cast<uint32_t>(std::lround(mProduct.mPulseLength * 1e9)));
}

CSimAlosWriter::~CSimAlosWriter()
{
    if (mFinished) return;
    mFiles.reset();
    std::error_code e;
    fs::remove_all(mPart, e);
}

void CSimAlosWriter::writeLine(const CSimAlosLine& theLine, const uint8_t* theSamples)
{
    if (mFinished) throw std::logic_error("a line written to a finished archive");
    uint8_t* r = mFiles->mRecord.data();
    // The record states the millisecond its pulse falls in.
    const double aMs = std::floor(theLine.mTime * 1000.0);
    const CCivilTime c = civilTime(mProduct.mReferenceDay, aMs / 1000.0, 1e-3);
    fqorvSimPutBE32(r, static_cast<uint32_t>(mRecords + 2));   // the descriptor is record 1
    fqorvSimPutBE32(r + 12, theLine.mLineNumber);
    fqorvSimPutBE32(r + 36, static_cast<uint32_t>(c.mYear));
    fqorvSimPutBE32(r + 40, static_cast<uint32_t>(c.mDayOfYear));
    fqorvSimPutBE32(r + 44, static_cast<uint32_t>(c.mSecondOfDay * 1000 + c.mFraction));
    fqorvSimPutBE32(r + 56, theLine.mPrfMilliHz);
    fqorvSimPutBE32(r + 116, static_cast<uint32_t>(theLine.mRange));
    std::memcpy(r + CQORV_SIM_ALOS_PREFIX, theSamples, 2 * static_cast<std::size_t>(mProduct.mSamples));
    for (std::size_t i = 0; i < mFiles->mImages.size(); ++i) {
        const std::string& aPol = mProduct.mPolarisations[i];
        fqorvSimPutBE16(r + 52, aPol[0] == 'V' ? 1 : 0);
        fqorvSimPutBE16(r + 54, aPol[1] == 'V' ? 1 : 0);
        mFiles->mImages[i]->append(mFiles->mRecord);
    }
    ++mRecords;
}

fs::path CSimAlosWriter::finish()
{
    const long aLines = mProduct.mDeclaredLines >= 0 ? mProduct.mDeclaredLines : mRecords;
    for (std::size_t i = 0; i < mFiles->mImages.size(); ++i) {
        const CRecord aDescriptor = imageDescriptor(mProduct, mProduct.mPolarisations[i], aLines);
        mFiles->mImages[i]->patch(0, aDescriptor.data(), aDescriptor.size());
        mFiles->mImages[i]->close();
    }
    mFiles->mImages.clear();
    if (fs::exists(mPath)) fs::remove_all(mPath);
    fs::rename(mPart, mPath);
    mFinished = true;
    return mPath;
}

// ------------------------------------------------------------------------------------------------
// The simulator's scenes

namespace {

/// Seconds from the midnight of the product's reference day of a scene time.
double productTime(const CSimScene& s, const CSimAlosProduct& p, double t)
{
    return s.mEpoch.mSeconds + t - 86400.0 * static_cast<double>(p.mReferenceDay - s.mEpoch.mDay);
}

/// An absolute orbit of the right size for the date: 671 orbits in the 46-day repeat cycle since
/// the launch. Not a real orbit.
int plausibleOrbit(const CSimScene& s)
{
    const double aDays = static_cast<double>(s.mEpoch.mDay - fqorvSimDaysFromCivil(2006, 1, 24)) + s.mEpoch.mSeconds / 86400.0;
    return 1 + static_cast<int>(std::max(0.0, aDays) * 671.0 / 46.0);
}

}  // namespace

CSimAlosProduct fqorvSimAlosSceneProduct(const CSimScene& s, const CSimTimeline& tl, const CSimOrbit& theOrbit,
                                         const CSimSceneTruth& theTruth)
{
    CSimAlosProduct p;
    const CSimRadar& r = s.mRadar;
    p.mOrbit = plausibleOrbit(s);
    const int aFrame = static_cast<int>(std::lround((s.mCentreLat + 90.0) * 20.0)) % 7200;
    char aId[64];
    std::snprintf(aId, sizeof aId, "ALPSRP%05d%04d-H1.0__%c", p.mOrbit % 100000, aFrame, s.mAscending ? 'A' : 'D');
    p.mSceneId = aId;
    p.mPolarisations = s.mOriginData == "ALOS_PALSAR_FBD10" ? std::vector<std::string>{r.mPolarisation, r.mPolarisation.substr(0, 1) + (r.mPolarisation[1] == 'H' ? "V" : "H")}
                                                            : std::vector<std::string>{r.mPolarisation};
    const double aFirst = s.mEpoch.mSeconds + tl.pulseTime(0);
    p.mReferenceDay = s.mEpoch.mDay + static_cast<long>(std::floor(aFirst / 86400.0));
    p.mSamples = s.mSamples;
    p.mWavelength = r.wavelength();
    p.mSamplingRate = r.mSamplingRate;
    p.mPulseLength = r.mPulseLength;
    p.mBandwidth = r.mBandwidth;
    p.mPrf = tl.prf(0);
    for (const auto& [aPulse, aCode] : s.mFaults.mPrfChanges) {
        (void)aCode;
        for (const CSimRecord& aRecord : tl.records())
            if (aRecord.mPulse >= aPulse) {
                if (p.mPrfSwitchLine < 0 || aRecord.mCounter < p.mPrfSwitchLine) p.mPrfSwitchLine = aRecord.mCounter;
                break;
            }
    }
    p.mCentreTime = productTime(s, p, theTruth.mCentreZeroDopplerTime);
    p.mCentreLatitude = theTruth.mCentreLat;
    p.mCentreLongitude = theTruth.mCentreLon;
    p.mIncidenceDeg = theTruth.mIncidenceDeg;

    const double aStart = productTime(s, p, tl.pulseTime(0)), aStop = productTime(s, p, tl.pulseTime(s.mPulses - 1));
    const double aStep = CQORV_SIM_ALOS_VECTOR_STEP;
    for (double t = std::floor((aStart - CQORV_SIM_ALOS_VECTOR_MARGIN) / aStep) * aStep;
         t <= std::ceil((aStop + CQORV_SIM_ALOS_VECTOR_MARGIN) / aStep) * aStep; t += aStep) {
        const double aSceneTime = t - productTime(s, p, 0.0);
        p.mStateVectors.push_back(fqorvSimStateVector(theOrbit.state(aSceneTime), t));
    }
    return p;
}

CSimAlosLine fqorvSimAlosSceneLine(const CSimScene& s, const CSimTimeline& tl, const CSimAlosProduct& p, const CSimRecord& theRecord)
{
    CSimAlosLine l;
    l.mLineNumber = theRecord.mCounter;
    l.mTime = productTime(s, p, tl.pulseTime(theRecord.mPulse));
    l.mPrfMilliHz = static_cast<uint32_t>(std::llround(tl.prf(theRecord.mPulse) * 1000.0));
    l.mRange = static_cast<int32_t>(std::lround(0.5 * CQORV_SIM_LIGHT * tl.windowDelay(theRecord.mPulse)));
    return l;
}

void fqorvSimAddAlosTruth(CJson& theTruth, const CSimScene& s, const CSimAlosProduct& p, const fs::path& theDirectory)
{
    CJson a = CJson::object();
    a["format"] = "ALOS CEOS level 1.0";
    a["layout"] = "ALOS level 1.0";
    a["path"] = theDirectory.filename().string();
    a["leader"] = CSimAlosWriter::leaderName(p);
    CJson aImages = CJson::array();
    for (const std::string& aPol : p.mPolarisations) aImages.push(CJson(CSimAlosWriter::imageName(p, aPol)));
    a["images"] = aImages;
    a["data_file"] = CSimAlosWriter::imageName(p, p.mPolarisations.front());
    a["first_record"] = static_cast<long>(CQORV_SIM_ALOS_FDR);
    a["record_length"] = static_cast<long>(recordLength(p));
    a["samples_pos"] = CQORV_SIM_ALOS_PREFIX;
    a["suffix"] = 2 * p.mRightFill;
    a["counter_pos"] = 12;
    a["range_pos"] = 116;
    a["orbit"] = p.mOrbit;
    a["prf_milli_hz"] = static_cast<long long>(std::llround(p.mPrf * 1000.0));
    a["prf_switch_line"] = p.mPrfSwitchLine;
    a["reference_day_offset"] = p.mReferenceDay - s.mEpoch.mDay;
    a["clock"] = "ms of day = floor(1000 t), t the transmit time of the record's pulse from the midnight of its day";
    a["window"] = "slant range at 116 = round(c / 2 * tau) m; tau_first is a whole metre's delay";
    const double aOffset = s.mEpoch.mSeconds - 86400.0 * static_cast<double>(p.mReferenceDay - s.mEpoch.mDay);
    a["state_vectors"] = fqorvSimVectorsJson(p.mStateVectors, aOffset, "leader");
    theTruth["archive"] = a;
    theTruth["raster"]["file"] = theDirectory.filename().string();
    theTruth["raster"]["header"] = CJson();
}
