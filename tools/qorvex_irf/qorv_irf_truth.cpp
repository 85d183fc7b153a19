#include "qorv_irf_truth.h"

#include <cmath>

#include "qorv_irf_ideal.h"

namespace {

/// theJson[theKey] as a number; throws naming the path when missing or not a number.
double number(const CJson& theJson, const char* theSection, const char* theKey)
{
    if (!theJson.isObject() || !theJson.has(theKey) || !theJson[theKey].isNumber())
        throw std::runtime_error(std::string("truth: missing number ") + theSection + "." + theKey);
    return theJson[theKey].number();
}

/// The same, theDefault when the key is absent.
double numberOr(const CJson& theJson, const char* theKey, double theDefault)
{
    return theJson.isObject() && theJson.has(theKey) && theJson[theKey].isNumber() ? theJson[theKey].number()
                                                                                  : theDefault;
}

const CJson& section(const CJson& theJson, const char* theKey)
{
    if (!theJson.has(theKey) || !theJson[theKey].isObject())
        throw std::runtime_error(std::string("truth: missing section ") + theKey);
    return theJson[theKey];
}

CIrfFigures figures(const CJson& theTheory, const char* theKey)
{
    CIrfFigures f;
    if (!theTheory.isObject() || !theTheory.has(theKey)) return f;
    const CJson& t = theTheory[theKey];
    f.mIrw = numberOr(t, "irw", 0.0);
    f.mPslrDb = numberOr(t, "pslr_db", 0.0);
    f.mIslrDb = numberOr(t, "islr_db", 0.0);
    f.mSet = f.mIrw > 0.0;
    return f;
}

/// Speed of the middle state vector of "orbit.state_vectors.vel", 0 when there is none.
double platformSpeed(const CJson& theJson)
{
    if (!theJson.has("orbit") || !theJson["orbit"].isObject()) return 0.0;
    const CJson& o = theJson["orbit"];
    if (!o.has("state_vectors") || !o["state_vectors"].has("vel")) return 0.0;
    const CJson& v = o["state_vectors"]["vel"];
    if (!v.isArray() || v.size() == 0) return 0.0;
    const std::vector<double> aVel = v[v.size() / 2].numbers();
    if (aVel.size() != 3) return 0.0;
    return std::sqrt(aVel[0] * aVel[0] + aVel[1] * aVel[1] + aVel[2] * aVel[2]);
}

}  // namespace

CIrfTruth fqorvIrfTruthFromJson(const CJson& theJson)
{
    if (!theJson.isObject()) throw std::runtime_error("truth: not a JSON object");
    CIrfTruth t;
    const CJson& r = section(theJson, "radar");
    t.mWavelength = number(r, "radar", "wavelength");
    t.mBandwidth = number(r, "radar", "bandwidth");
    t.mSamplingRate = number(r, "radar", "sampling_rate");
    t.mPrf = number(r, "radar", "prf");
    t.mPulseLength = numberOr(r, "pulse_length", 0.0);
    t.mAntennaLength = numberOr(r, "antenna_length", 0.0);
    t.mCentroid = number(section(theJson, "doppler"), "doppler", "centroid");
    t.mEffectiveVelocity = number(section(theJson, "velocity"), "velocity", "true_processing_velocity");
    t.mPlatformVelocity = platformSpeed(theJson);
    if (t.mBandwidth <= 0.0 || t.mSamplingRate <= 0.0 || t.mPrf <= 0.0)
        throw std::runtime_error("truth: bandwidth, sampling rate and PRF must be positive");

    if (!theJson.has("targets") || !theJson["targets"].isArray())
        throw std::runtime_error("truth: missing array targets");
    const CJson& aTargets = theJson["targets"];
    for (std::size_t i = 0; i < aTargets.size(); ++i) {
        const CJson& j = aTargets[i];
        CIrfTarget aT;
        aT.mId = j.has("id") && j["id"].isString() ? j["id"].string() : "T" + std::to_string(i);
        aT.mLine = number(j, "targets[]", "expected_line");
        aT.mPixel = number(j, "targets[]", "expected_pixel");
        aT.mIsolated = !j.has("isolated") || j["isolated"].kind() != CJson::Kind::Bool || j["isolated"].boolean();
        if (j.has("expected_phase_fd_deg") && j["expected_phase_fd_deg"].isNumber()) {
            aT.mHasPhase = true;
            aT.mPhaseDeg = j["expected_phase_fd_deg"].number();
        }
        t.mTargets.push_back(aT);
    }
    if (theJson.has("theory")) {
        t.mTheoryRange = figures(theJson["theory"], "range_chain_ideal");
        t.mTheoryAzimuth = figures(theJson["theory"], "azimuth_centre");
    }
    return t;
}

CIrfTruth fqorvIrfReadTruth(const std::string& thePath)
{
    CJson aJson;
    try {
        aJson = CJson::parseFile(thePath);
    } catch (const std::exception& e) {
        throw std::runtime_error("cannot read the truth file " + thePath + ": " + e.what());
    }
    return fqorvIrfTruthFromJson(aJson);
}

CIrfIdeal fqorvIrfIdealForTruth(const CIrfTruth& theTruth, double theAzFraction, int theUpsample,
                                double thePatternVelocity)
{
    CIrfIdeal aIdeal;
    aIdeal.mAzFraction = theAzFraction;
    if (theTruth.mPulseLength > 0.0) {
        aIdeal.mRangeModel = "chirp";
        aIdeal.mRange = fqorvIrfIdealRangeChirp(theTruth.mBandwidth, theTruth.mPulseLength, theTruth.mSamplingRate,
                                                theUpsample);
    } else {
        aIdeal.mRangeModel = "band";
        aIdeal.mRange = fqorvIrfIdealRangeBand(theTruth.mBandwidth, theTruth.mSamplingRate, theUpsample);
    }

    // The beam sweeps Doppler at the platform's speed: f - fdc = 2 Vs sin(psi) / lambda. The
    // effective velocity (about 6 % lower for a low orbit) is the fallback without an orbit.
    if (theTruth.mAntennaLength <= 0.0) {
        aIdeal.mVelocitySource = "none";
    } else if (thePatternVelocity > 0.0) {
        aIdeal.mPatternVelocity = thePatternVelocity;
        aIdeal.mVelocitySource = "option";
    } else if (theTruth.mPlatformVelocity > 0.0) {
        aIdeal.mPatternVelocity = theTruth.mPlatformVelocity;
        aIdeal.mVelocitySource = "platform";
    } else {
        aIdeal.mPatternVelocity = theTruth.mEffectiveVelocity;
        aIdeal.mVelocitySource = "effective";
    }
    aIdeal.mAzimuth = fqorvIrfIdealAzimuth(theTruth.mPrf, theAzFraction, theTruth.mCentroid,
                                           aIdeal.mPatternVelocity > 0.0 ? theTruth.mAntennaLength : 0.0,
                                           aIdeal.mPatternVelocity, theUpsample);
    return aIdeal;
}
