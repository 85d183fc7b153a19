#include "qorv_sim_scene.h"

#include <algorithm>
#include <cstdio>
#include <stdexcept>

#include "qorv_json.h"
#include "qorv_sim_asar.h"
#include "qorv_sim_geometry.h"
#include "qorv_sim_random.h"
#include "qorv_sim_timeline.h"

namespace {

constexpr double CQORV_SIM_LIGHT = 299792458.0;

// ------------------------------------------------------------------------------------------------
// Presets

void presetErs2(CSimScene& s, bool theFull)
{
    s.mRadar = CSimRadar{};
    s.mRadar.mSensorName = "ERS-2";
    s.mRadar.mPolarisation = "VV";
    s.mRadar.mCarrier = 5.3e9;
    s.mRadar.mBandwidth = 15.55e6;
    s.mRadar.mPulseLength = 37.12e-6;
    s.mRadar.mSamplingRate = 18.96e6;
    s.mRadar.mUpChirp = true;
    s.mRadar.mPriCode = 2820;
    s.mRadar.mAntennaLength = 10.0;
    s.mFormat = CSimSampleFormat::Ubyte5Bit;
    s.mPrefix = CSimPrefixLayout{};  // 412 bytes: counter 210, SWST 214 (4 samples a code), PRI 60
    s.mDataUnits = "ERS RAW";
    s.mOriginData.clear();
    s.mKepler = CSimKepler{};
    s.mKepler.mA = 7159500.0;
    s.mKepler.mE = 0.001165;
    s.mKepler.mInc = 98.52 * CQORV_SIM_DEG;
    s.mKepler.mArgp = 90.0 * CQORV_SIM_DEG;
    s.mCentreLat = 44.52;
    s.mCentreLon = 11.34;
    s.mIncidenceDeg = 23.0;
    s.mAscending = false;
    fqorvSimParseIsoDate("1997-06-12T09:52:41.500000", s.mEpoch);
    s.mDopplerCentroid = 290.0;
    s.mCounter0 = 2470011;
    s.mPulses = theFull ? 28000 : 3584;
    s.mSamples = theFull ? 5616 : 1792;
    s.mGrid = theFull ? CSimGridRequest{20, 15} : CSimGridRequest{4, 4};
}

/// ERS-1: the ERS-2 radar and orbit, an earlier date.
void presetErs1(CSimScene& s, bool theFull)
{
    presetErs2(s, theFull);
    s.mRadar.mSensorName = "ERS-1";
    fqorvSimParseIsoDate("1993-03-09T10:21:17.250000", s.mEpoch);
    s.mCounter0 = 1180411;
}

void presetEnvisat(CSimScene& s, bool theFull)
{
    s.mRadar = CSimRadar{};
    s.mRadar.mSensorName = "ENVISAT-1";
    s.mRadar.mPolarisation = "VV";
    s.mRadar.mCarrier = 5.331e9;
    s.mRadar.mBandwidth = 16.0e6;
    s.mRadar.mPulseLength = 27.1e-6;
    s.mRadar.mSamplingRate = 19.20768e6;
    s.mRadar.mUpChirp = true;
    s.mRadar.mPriCode = 11624;  // PRI in samples: PRF = fs / code = 1652.4 Hz
    s.mRadar.mAntennaLength = 10.0;
    s.mFormat = CSimSampleFormat::FloatBaq4Bit;
    s.mPrefix = CSimPrefixLayout{64, 54, 58, 1, 60, 0.0, 0, true, -1};
    s.mDataUnits.clear();
    s.mOriginData.clear();
    s.mKepler = CSimKepler{};
    s.mKepler.mA = 7159500.0;
    s.mKepler.mE = 0.001165;
    s.mKepler.mInc = 98.55 * CQORV_SIM_DEG;
    s.mKepler.mArgp = 90.0 * CQORV_SIM_DEG;
    s.mCentreLat = 51.12;
    s.mCentreLon = 4.47;
    s.mIncidenceDeg = 23.0;
    s.mAscending = false;
    fqorvSimParseIsoDate("2005-09-20T10:18:05.250000", s.mEpoch);
    s.mDopplerCentroid = 210.0;
    s.mCounter0 = 8101;
    s.mPulses = theFull ? 30000 : 3584;
    s.mSamples = theFull ? 5680 : 1792;
    s.mGrid = theFull ? CSimGridRequest{20, 15} : CSimGridRequest{4, 4};
}

void presetAlos(CSimScene& s, bool theFull, bool theFbd)
{
    s.mRadar = CSimRadar{};
    s.mRadar.mSensorName = "ALOS_PALSAR";
    s.mRadar.mPolarisation = "HH";
    s.mRadar.mCarrier = 1.27e9;
    s.mRadar.mBandwidth = theFbd ? 14.0e6 : 28.0e6;
    s.mRadar.mPulseLength = 27.0e-6;
    s.mRadar.mSamplingRate = theFbd ? 16.0e6 : 32.0e6;
    s.mRadar.mUpChirp = false;
    s.mRadar.mPriCode = 2193;  // in the ERS unit: PRF 2159.8 Hz
    s.mRadar.mAntennaLength = 8.9;
    s.mFormat = CSimSampleFormat::Ubyte5Bit;
    // 412 bytes: counter at 12, slant range of the first sample at 116; the window's moves are
    // counted in samples.
    s.mPrefix = CSimPrefixLayout{412, 12, -1, 1, 60, 210.94e-9, 2, false, 116};
    s.mDataUnits.clear();
    s.mOriginData = theFbd ? "ALOS_PALSAR_FBD10" : "ALOS_PALSAR_FBS10";
    s.mKepler = CSimKepler{};
    s.mKepler.mA = 7070000.0;
    s.mKepler.mE = 0.0001;
    s.mKepler.mInc = 98.16 * CQORV_SIM_DEG;
    s.mKepler.mArgp = 90.0 * CQORV_SIM_DEG;
    s.mCentreLat = 35.68;
    s.mCentreLon = 139.2;
    s.mIncidenceDeg = 38.7;
    s.mAscending = true;
    fqorvSimParseIsoDate("2007-03-02T13:27:14.750000", s.mEpoch);
    s.mDopplerCentroid = 120.0;
    s.mCounter0 = 1;
    // An L-band aperture is long: the demo scene holds one full processed aperture and a margin.
    s.mPulses = theFull ? 28000 : 9216;
    s.mSamples = theFull ? (theFbd ? 2576 : 5152) : (theFbd ? 1280 : 2048);
    s.mGrid = theFull ? CSimGridRequest{16, 12} : CSimGridRequest{3, 3};
}

// ------------------------------------------------------------------------------------------------
// Scene file helpers

double num(const CJson& o, const char* k, double theDefault)
{
    if (!o.isObject() || !o.has(k) || o[k].isNull()) return theDefault;
    if (!o[k].isNumber()) throw std::runtime_error(std::string("scene: \"") + k + "\" must be a number");
    return o[k].number();
}

std::string text(const CJson& o, const char* k, const std::string& theDefault)
{
    if (!o.isObject() || !o.has(k) || o[k].isNull()) return theDefault;
    if (!o[k].isString()) throw std::runtime_error(std::string("scene: \"") + k + "\" must be a text");
    return o[k].string();
}

const CJson* member(const CJson& o, const char* k)
{
    return o.isObject() && o.has(k) && o[k].isObject() ? &o[k] : nullptr;
}

CSimVec3 vec3(const CJson& theArray, const char* theKey)
{
    if (!theArray.isArray() || theArray.size() != 3)
        throw std::runtime_error(std::string("scene: \"") + theKey + "\" must be an array of 3 numbers");
    return {theArray[std::size_t{0}].number(), theArray[std::size_t{1}].number(), theArray[std::size_t{2}].number()};
}

void applyRadar(CSimScene& s, const CJson& r)
{
    s.mRadar.mSensorName = text(r, "sensor", s.mRadar.mSensorName);
    s.mRadar.mPolarisation = text(r, "polarisation", s.mRadar.mPolarisation);
    s.mRadar.mCarrier = num(r, "f0", s.mRadar.mCarrier);
    s.mRadar.mBandwidth = num(r, "bandwidth", s.mRadar.mBandwidth);
    s.mRadar.mPulseLength = num(r, "pulse_length", s.mRadar.mPulseLength);
    s.mRadar.mSamplingRate = num(r, "sampling_rate", s.mRadar.mSamplingRate);
    s.mRadar.mAntennaLength = num(r, "antenna_length", s.mRadar.mAntennaLength);
    s.mRadar.mPatternExtent = num(r, "pattern_extent", s.mRadar.mPatternExtent);
    const std::string aChirp = text(r, "chirp", "");
    if (!aChirp.empty()) s.mRadar.mUpChirp = aChirp == "up";
    const bool aHasCode = r.has("pri_code") && r["pri_code"].isNumber();
    const bool aHasPrf = r.has("prf") && r["prf"].isNumber();
    if (aHasCode) {
        s.mRadar.mPriCode = static_cast<int>(r["pri_code"].number());
        s.mRadar.mPrf = 0.0;
    }
    if (aHasPrf) {
        // radar.prf wins: the pulses follow it, and the prefixes carry radar.pri_code when it is
        // given, else the code nearest to it.
        s.mRadar.mPrf = r["prf"].number();
        if (!aHasCode) s.mRadar.mPriCode = fqorvSimCodeOfPrf(s.mPrefix, s.mRadar.mSamplingRate, s.mRadar.mPrf);
    }
}

void applyOrbit(CSimScene& s, const CJson& o)
{
    if (const CJson* k = member(o, "kepler")) {
        s.mHasKepler = true;
        s.mKepler.mA = num(*k, "a", s.mKepler.mA);
        s.mKepler.mE = num(*k, "e", s.mKepler.mE);
        s.mKepler.mInc = num(*k, "inc_deg", s.mKepler.mInc / CQORV_SIM_DEG) * CQORV_SIM_DEG;
        s.mKepler.mArgp = num(*k, "argp_deg", s.mKepler.mArgp / CQORV_SIM_DEG) * CQORV_SIM_DEG;
        s.mKepler.mMu = num(*k, "mu", s.mKepler.mMu);
        s.mKepler.mOmegaEarth = num(*k, "omega_earth", s.mKepler.mOmegaEarth);
        const bool aPlaced = k->has("raan_deg") && k->has("m0_deg");
        if (aPlaced) {
            s.mKepler.mRaan = num(*k, "raan_deg", 0.0) * CQORV_SIM_DEG;
            s.mKepler.mM0 = num(*k, "m0_deg", 0.0) * CQORV_SIM_DEG;
            s.mKepler.mThetaG0 = num(*k, "theta_g0", 0.0);
        }
        s.mOrbitPlaced = aPlaced;
        return;
    }
    if (const CJson* v = member(o, "state_vectors")) {
        const CJson& t = (*v)["times"];
        const CJson& p = (*v)["pos"];
        const CJson& w = (*v)["vel"];
        if (!t.isArray() || !p.isArray() || !w.isArray() || t.size() != p.size() || t.size() != w.size())
            throw std::runtime_error("scene: orbit.state_vectors needs times, pos and vel of one length");
        s.mHasKepler = false;
        s.mOrbitPlaced = true;
        s.mVectorTimes = t.numbers();
        s.mVectors.clear();
        for (std::size_t i = 0; i < t.size(); ++i) s.mVectors.push_back({vec3(p[i], "pos"), vec3(w[i], "vel")});
    }
}

CSimTarget parseTarget(const CSimScene& s, const CJson& t, std::size_t theIndex)
{
    CSimTarget aTarget;
    char aId[32];
    std::snprintf(aId, sizeof aId, "P%03zu", theIndex);
    aTarget.mId = text(t, "id", aId);
    aTarget.mAmplitude = num(t, "amplitude", 1.0);
    aTarget.mPhaseDeg = num(t, "phase_deg", 0.0);
    if (t.has("ecef")) {
        aTarget.mEcef = vec3(t["ecef"], "ecef");
    } else if (t.has("lat") && t.has("lon")) {
        aTarget.mEcef = fqorvSimGeodeticToEcef(s.mEllipsoid, num(t, "lat", 0.0) * CQORV_SIM_DEG,
                                               num(t, "lon", 0.0) * CQORV_SIM_DEG, num(t, "h", 0.0));
    } else if (t.has("line") && t.has("pixel")) {
        aTarget.mFromImage = true;
        aTarget.mLine = num(t, "line", 0.0);
        aTarget.mPixel = num(t, "pixel", 0.0);
        aTarget.mHeight = num(t, "h", 0.0);
    } else {
        throw std::runtime_error("scene: target " + aTarget.mId + " needs ecef, lat/lon(/h) or line/pixel(/h)");
    }
    return aTarget;
}

void applyFaults(CSimScene& s, const CJson& e)
{
    if (e.has("dropped_pulses"))
        for (double v : e["dropped_pulses"].numbers()) s.mFaults.mDroppedPulses.push_back(static_cast<long>(v));
    if (e.has("repeated_pulses"))
        for (double v : e["repeated_pulses"].numbers()) s.mFaults.mRepeatedPulses.push_back(static_cast<long>(v));
    if (e.has("swst_changes"))
        for (const CJson& c : e["swst_changes"].elements())
            s.mFaults.mSwstChanges.push_back({static_cast<long>(num(c, "pulse", 0)), static_cast<int>(num(c, "codes", 0))});
    if (e.has("prf_changes"))
        for (const CJson& c : e["prf_changes"].elements())
            s.mFaults.mPrfChanges.push_back({static_cast<long>(num(c, "pulse", 0)), static_cast<int>(num(c, "pri_code", 0))});
    if (e.has("garbage"))
        for (const CJson& c : e["garbage"].elements()) {
            CSimGarbage g;
            g.mPulse = static_cast<long>(num(c, "pulse", 0));
            if (!fqorvSimParseGarbageField(text(c, "field", ""), g.mField))
                throw std::runtime_error("scene: events.garbage[].field must be pri, swst, counter, clock or marker");
            g.mValue = static_cast<long long>(num(c, "value", -1.0));
            s.mFaults.mGarbage.push_back(g);
        }
}

// ------------------------------------------------------------------------------------------------
// Completion

/// The window of a native ERS archive: an archive states the first sample's delay only as
/// SWST code x 4 / fs + 9 PRI - 6.622 us, so the window lies on that grid, at the code nearest to the
/// wanted delay (a given tau_first, else a given code, else the derived delay).
void snapWindowToCodes(CSimScene& s, double theWantedDelay)
{
    const double aUnit = NQORV_ERS::SWST_SAMPLES_PER_CODE / s.mRadar.mSamplingRate;
    const double aFixed = NQORV_ERS::RANK / s.mRadar.mPrf - NQORV_ERS::DELAY_BIAS;
    if (!std::isnan(s.mTauFirst) || s.mSwstCode0 < 0)
        s.mSwstCode0 = static_cast<int>(std::lround(((std::isnan(s.mTauFirst) ? theWantedDelay : s.mTauFirst) - aFixed) / aUnit));
    s.mTauFirst = s.mSwstCode0 * aUnit + aFixed;
    if (s.mSwstCode0 < NQORV_ERS::SWST_MIN || s.mSwstCode0 > NQORV_ERS::SWST_MAX)
        throw std::runtime_error("the window's SWST code " + std::to_string(s.mSwstCode0) + " is outside " +
                                 std::to_string(NQORV_ERS::SWST_MIN) + " .. " + std::to_string(NQORV_ERS::SWST_MAX));
}

/// The echo window: opens a whole number of PRIs plus whole SWST codes after the transmit
/// event, placed so that the scene centre falls in the middle of the compressed swath.
void deriveWindow(CSimScene& s, double theCentreRange)
{
    const double fs = s.mRadar.mSamplingRate;
    const double aPri = 1.0 / s.mRadar.mPrf;
    const int spc = std::max(1, s.mPrefix.mSwstSamplesPerCode);
    const int aWidth = s.mSamples - fqorvSimReplicaPoints(s.mRadar);
    const double aWanted = 2.0 * (theCentreRange - 0.5 * aWidth * s.mRadar.rangeSpacing()) / CQORV_SIM_LIGHT;
    if (s.mArchive == CSimArchive::Alos) {
        // The records state the first sample's slant range in whole metres.
        const double aTau = std::isnan(s.mTauFirst) ? aWanted : s.mTauFirst;
        s.mTauFirst = 2.0 * std::round(0.5 * CQORV_SIM_LIGHT * aTau) / CQORV_SIM_LIGHT;
        s.mSwstCode0 = 0;
        return;
    }
    if (s.mArchive == CSimArchive::Asar) {
        fqorvSimAsarSnapWindow(s, aWanted);
        return;
    }
    if (s.mArchive != CSimArchive::Raw) {
        snapWindowToCodes(s, aWanted);
        return;
    }
    if (std::isnan(s.mTauFirst)) {
        const double aTau = aWanted;
        const double aRank = std::floor(aTau / aPri);
        const long aCode = std::lround((aTau - aRank * aPri) * fs / spc);
        s.mTauFirst = aRank * aPri + static_cast<double>(aCode) * spc / fs;
        if (s.mSwstCode0 < 0) s.mSwstCode0 = static_cast<int>(aCode);
    }
    if (s.mSwstCode0 < 0) {
        const double aRank = std::floor(s.mTauFirst / aPri);
        s.mSwstCode0 = static_cast<int>(std::lround((s.mTauFirst - aRank * aPri) * fs / spc));
    }
}

/// Targets on a rows x cols grid of the focused image, each moved off the grid by a random
/// fraction of a line and of a pixel, with random phases. Rows keep their processed aperture
/// (Doppler band of 0.8 PRF around the centroid) inside the scene when the scene is long enough.
void placeGrid(CSimScene& s, const CSimGeometry& g, const CSimTimeline& theTimeline, double theRateAtCentre)
{
    const double aPrf = s.mRadar.mPrf;
    const double aRate = std::fabs(theRateAtCentre);
    const double aHalf = 0.4 * aPrf * aPrf / aRate;                 // lines, half processed aperture
    const double aShift = s.mDopplerCentroid * aPrf / aRate;        // zero-Doppler minus beam-centre line
    const double aMargin = 32.0;
    double lo = aMargin + aHalf + aShift;
    double hi = static_cast<double>(s.mPulses - 1) - aMargin - aHalf + aShift;
    if (lo > hi) {  // too short for a full aperture: spread the rows over the middle third
        const double c = 0.5 * (s.mPulses - 1) + aShift;
        lo = c - s.mPulses / 6.0;
        hi = c + s.mPulses / 6.0;
    }
    const int aWidth = s.mSamples - fqorvSimReplicaPoints(s.mRadar);
    const double pLo = std::min(24.0, 0.1 * aWidth), pHi = aWidth - 1 - pLo;
    const double aNear = 0.5 * CQORV_SIM_LIGHT * s.mTauFirst;
    CSimRandom aRandom(s.mSeed, CQORV_SIM_STREAM_TARGETS, 0);
    for (int r = 0; r < s.mGrid.mRows; ++r)
        for (int c = 0; c < s.mGrid.mCols; ++c) {
            const double aLine = std::floor(lo + (hi - lo) * (r + 0.5) / s.mGrid.mRows) + 0.15 + 0.7 * aRandom.uniform();
            const double aPixel = std::floor(pLo + (pHi - pLo) * (c + 0.5) / s.mGrid.mCols) + 0.15 + 0.7 * aRandom.uniform();
            CSimTarget t;
            char aId[32];
            if (s.mGrid.mRows <= 10 && s.mGrid.mCols <= 10)
                std::snprintf(aId, sizeof aId, "T%d%d", r, c);
            else
                std::snprintf(aId, sizeof aId, "T%02d_%02d", r, c);
            t.mId = aId;
            t.mAmplitude = 1.0;
            t.mPhaseDeg = 360.0 * aRandom.uniform() - 180.0;
            t.mEcef = g.locate(theTimeline.timeOfPulse(aLine), aNear + aPixel * s.mRadar.rangeSpacing(), s.mCentreHeight,
                               s.mLookSign, s.mEllipsoid);
            s.mTargets.push_back(t);
        }
}

/// Random scatterers spread uniformly over the focused image and mScattererMargin lines beyond each
/// of its ends, complex Gaussian reflectivity.
void placeScatterers(CSimScene& s, const CSimGeometry& g, const CSimTimeline& theTimeline)
{
    const int aWidth = s.mSamples - fqorvSimReplicaPoints(s.mRadar);
    const double aNear = 0.5 * CQORV_SIM_LIGHT * s.mTauFirst;
    CSimRandom aRandom(s.mSeed, CQORV_SIM_STREAM_SCATTERERS, 0);
    for (long i = 0; i < s.mScatterers; ++i) {
        CSimTarget t;
        t.mId = "S" + std::to_string(i);
        t.mListed = false;
        double a, b;
        aRandom.gaussianPair(a, b);
        t.mAmplitude = s.mScattererRms * std::sqrt(0.5 * (a * a + b * b));
        t.mPhaseDeg = std::atan2(b, a) / CQORV_SIM_DEG;
        const double aLine = aRandom.uniform() * (s.mPulses - 1 + 2.0 * s.mScattererMargin) - s.mScattererMargin;
        const double aPixel = aRandom.uniform() * (aWidth - 1);
        t.mEcef = g.locate(theTimeline.timeOfPulse(aLine), aNear + aPixel * s.mRadar.rangeSpacing(), s.mCentreHeight,
                           s.mLookSign, s.mEllipsoid);
        s.mTargets.push_back(t);
    }
}

void checkFaults(const CSimScene& s)
{
    auto inside = [&](long p, const char* what, bool theAllowFirst) {
        if (p < (theAllowFirst ? 0 : 1) || p >= s.mPulses)
            throw std::runtime_error(std::string(what) + " at pulse " + std::to_string(p) + " is outside 1 .. " +
                                     std::to_string(s.mPulses - 1));
    };
    for (long p : s.mFaults.mDroppedPulses) inside(p, "a dropped line", false);
    for (long p : s.mFaults.mRepeatedPulses) inside(p, "a repeated line", true);
    for (const auto& [p, n] : s.mFaults.mSwstChanges) {
        inside(p, "an SWST change", false);
        if (n == 0) throw std::runtime_error("an SWST change of 0 codes changes nothing");
        if (s.mPrefix.mSwstPos < 0 && s.mPrefix.mRangePos < 0)
            throw std::runtime_error("this sensor's prefix holds no window field");
    }
    for (const auto& [p, c] : s.mFaults.mPrfChanges) {
        inside(p, "a PRF change", false);
        if (c <= 0 || c > 65535) throw std::runtime_error("a PRI code must lie in 1 .. 65535");
        if (s.mPrefix.mPriPos < 0) throw std::runtime_error("this sensor's prefix holds no PRI code");
    }
    for (const CSimGarbage& g : s.mFaults.mGarbage) {
        inside(g.mPulse, "garbage", true);
        if (std::find(s.mFaults.mDroppedPulses.begin(), s.mFaults.mDroppedPulses.end(), g.mPulse) !=
            s.mFaults.mDroppedPulses.end())
            throw std::runtime_error("garbage at pulse " + std::to_string(g.mPulse) + ", which is dropped");
        const long long aTop = g.mField == CSimGarbageField::Marker ? 255
                               : (g.mField == CSimGarbageField::Pri || g.mField == CSimGarbageField::Swst) ? 65535
                                                                                                            : 4294967295LL;
        if (g.mValue > aTop)
            throw std::runtime_error(std::string("a garbage ") + fqorvSimGarbageName(g.mField) + " is at most " +
                                     std::to_string(aTop));
    }
}

/// What a native ERS archive demands of a scene: ERS 5-bit samples, the format's line width, the
/// format's radar values where it states none, and the PRF of the PRI code (the only PRF it states).
void completeNative(CSimScene& s)
{
    if (s.mArchive == CSimArchive::Raw) return;
    if (s.mArchive == CSimArchive::Asar) {
        fqorvSimAsarCompleteScene(s);
        return;
    }
    CSimRadar& r = s.mRadar;
    if (s.mCodeBits != 5) throw std::runtime_error("a native archive holds 5-bit samples (--bits 5)");
    if (s.mHeaderOffset != 0) throw std::runtime_error("--header-offset has no place in a native archive");
    if (s.mArchive == CSimArchive::Alos) {
        if (!s.mFaults.mGarbage.empty()) throw std::runtime_error("ALOS archives take no garbage codes");
    } else if (s.mArchive == CSimArchive::Envisat) {
        if (s.mSamples != NQORV_SIM_ENVISAT::SAMPLES)
            throw std::runtime_error("an ENVISAT-format ERS line holds " + std::to_string(NQORV_SIM_ENVISAT::SAMPLES) +
                                     " samples, not " + std::to_string(s.mSamples));
        r.mCarrier = NQORV_ERS::CARRIER;
        r.mSamplingRate = NQORV_ERS::SAMPLING_RATE;
        r.mPulseLength = NQORV_ERS::PULSE_LENGTH;
        r.mBandwidth = NQORV_ERS::CHIRP_RATE * NQORV_ERS::PULSE_LENGTH;
        r.mUpChirp = true;
    } else {
        const CSimCeosVariant& v = fqorvSimCeosVariant(s.mCeosLayout);
        if (s.mSamples > v.capacity())
            throw std::runtime_error(std::string("a ") + v.mName + " line record holds at most " +
                                     std::to_string(v.capacity()) + " samples, not " + std::to_string(s.mSamples));
    }
    r.mPrf = fqorvSimPrfOfCode(s.mPrefix, r.mSamplingRate, r.mPriCode);
}

}  // namespace

// ------------------------------------------------------------------------------------------------

double CSimRadar::wavelength() const { return CQORV_SIM_LIGHT / mCarrier; }

double CSimRadar::rangeSpacing() const { return CQORV_SIM_LIGHT / (2.0 * mSamplingRate); }

std::vector<std::string> fqorvSimPresetNames() { return {"ers2", "ers1", "envisat", "alos", "alos-fbd"}; }

const char* fqorvSimGarbageName(CSimGarbageField theField)
{
    static const char* const aNames[5] = {"pri", "swst", "counter", "clock", "marker"};
    return aNames[static_cast<int>(theField)];
}

bool fqorvSimParseGarbageField(const std::string& theName, CSimGarbageField& theField)
{
    for (int i = 0; i < 5; ++i)
        if (theName == fqorvSimGarbageName(static_cast<CSimGarbageField>(i))) {
            theField = static_cast<CSimGarbageField>(i);
            return true;
        }
    return false;
}

void fqorvSimApplyArchive(CSimScene& theScene, CSimArchive theArchive, CSimCeosLayout theLayout)
{
    theScene.mArchive = theArchive;
    theScene.mCeosLayout = theLayout;
    if (theArchive == CSimArchive::Raw) return;
    const std::string& aSensor = theScene.mRadar.mSensorName;
    if ((theArchive == CSimArchive::Alos) != (aSensor == "ALOS_PALSAR"))
        throw std::runtime_error(theArchive == CSimArchive::Alos
                                     ? "ALOS archives hold ALOS PALSAR scenes only, not " + aSensor
                                     : "ALOS PALSAR scenes are written as ALOS archives (--format alos)");
    if (theArchive == CSimArchive::Alos) {
        theScene.mPrefix.mPrfStep = 1e-3;
        return;
    }
    if (theArchive == CSimArchive::Asar) {
        if (aSensor != "ENVISAT-1" || theScene.mFormat != CSimSampleFormat::FloatBaq4Bit)
            throw std::runtime_error("ASAR level 0 products hold ENVISAT-1 scenes only, not " + aSensor + " (preset \"" +
                                     theScene.mPreset + "\")");
        return;
    }
    if ((aSensor != "ERS-1" && aSensor != "ERS-2") || theScene.mFormat != CSimSampleFormat::Ubyte5Bit)
        throw std::runtime_error("ERS CEOS and .E1/.E2 archives hold ERS-1 and ERS-2 scenes only, not " + aSensor +
                                 " (preset \"" + theScene.mPreset + "\")");
    if (theArchive == CSimArchive::Envisat) theScene.mSamples = NQORV_SIM_ENVISAT::SAMPLES;
    else theScene.mSamples = std::min(theScene.mSamples, fqorvSimCeosVariant(theLayout).capacity());
}

bool fqorvSimApplyPreset(CSimScene& theScene, const std::string& theName, bool theFullFrame)
{
    if (theName == "ers2")
        presetErs2(theScene, theFullFrame);
    else if (theName == "ers1")
        presetErs1(theScene, theFullFrame);
    else if (theName == "envisat")
        presetEnvisat(theScene, theFullFrame);
    else if (theName == "alos" || theName == "alos-fbs")
        presetAlos(theScene, theFullFrame, false);
    else if (theName == "alos-fbd")
        presetAlos(theScene, theFullFrame, true);
    else
        return false;
    theScene.mPreset = theName;
    theScene.mRadar.mPrf = 0.0;
    theScene.mHasKepler = true;
    theScene.mOrbitPlaced = false;
    theScene.mStartTime = std::nan("");
    theScene.mTauFirst = std::nan("");
    theScene.mSwstCode0 = -1;
    theScene.mTargets.clear();
    return true;
}

double fqorvSimPrfOfCode(const CSimPrefixLayout& theLayout, double theSamplingRate, int theCode)
{
    const double aPrf = theLayout.mPriInSamples ? theSamplingRate / theCode : 1.0 / ((theCode + theLayout.mPriOffset) * theLayout.mPriUnit);
    return theLayout.mPrfStep > 0.0 ? std::round(aPrf / theLayout.mPrfStep) * theLayout.mPrfStep : aPrf;
}

int fqorvSimCodeOfPrf(const CSimPrefixLayout& theLayout, double theSamplingRate, double thePrf)
{
    if (theLayout.mPriInSamples) return static_cast<int>(std::lround(theSamplingRate / thePrf));
    return static_cast<int>(std::lround(1.0 / (thePrf * theLayout.mPriUnit))) - theLayout.mPriOffset;
}

int fqorvSimReplicaPoints(const CSimRadar& theRadar)
{
    return static_cast<int>(theRadar.mPulseLength * theRadar.mSamplingRate) + 1;
}

void fqorvSimApplySceneJson(CSimScene& s, const CJson& j)
{
    if (!j.isObject()) throw std::runtime_error("scene: the file must hold a JSON object");
    if (const CJson* c = member(j, "conventions")) {
        if (c->has("ellipsoid_axes")) {
            const std::vector<double> ax = (*c)["ellipsoid_axes"].numbers();
            if (ax.size() != 2) throw std::runtime_error("scene: conventions.ellipsoid_axes needs 2 numbers");
            s.mEllipsoid = {ax[0], ax[1]};
        }
        const std::string aChirp = text(*c, "chirp", "");
        if (!aChirp.empty()) s.mRadar.mUpChirp = aChirp == "up";
    }
    if (const CJson* m = member(j, "simulator")) {
        s.mSeed = static_cast<uint64_t>(num(*m, "seed", static_cast<double>(s.mSeed)));
        s.mPulses = static_cast<long>(num(*m, "lines", static_cast<double>(s.mPulses)));
        s.mSamples = static_cast<int>(num(*m, "samples", s.mSamples));
    }
    if (const CJson* r = member(j, "radar")) applyRadar(s, *r);
    if (const CJson* r = member(j, "raster")) {
        s.mSamples = static_cast<int>(num(*r, "samples", s.mSamples));
        s.mPulses = static_cast<long>(num(*r, "pulses", static_cast<double>(s.mPulses)));
        s.mCounter0 = static_cast<long>(num(*r, "counter0", static_cast<double>(s.mCounter0)));
        s.mHeaderOffset = static_cast<int32_t>(num(*r, "header_offset", s.mHeaderOffset));
        s.mRmsDn = num(*r, "rms_dn", s.mRmsDn);
    }
    if (const CJson* w = member(j, "window")) {
        s.mTauFirst = num(*w, "tau_first", s.mTauFirst);
        s.mSwstCode0 = static_cast<int>(num(*w, "swst_code0", s.mSwstCode0));
    }
    if (const CJson* t = member(j, "timing")) {
        const std::string aEpoch = text(*t, "epoch_utc", "");
        if (!aEpoch.empty() && !fqorvSimParseIsoDate(aEpoch, s.mEpoch))
            throw std::runtime_error("scene: timing.epoch_utc is not a date YYYY-MM-DDThh:mm:ss.ffffff");
        s.mStartTime = num(*t, "t_start", s.mStartTime);
    }
    if (const CJson* o = member(j, "orbit")) applyOrbit(s, *o);
    if (const CJson* c = member(j, "scene_centre")) {
        s.mCentreLat = num(*c, "lat", s.mCentreLat);
        s.mCentreLon = num(*c, "lon", s.mCentreLon);
        s.mCentreHeight = num(*c, "h", s.mCentreHeight);
        s.mIncidenceDeg = num(*c, "incidence_deg", s.mIncidenceDeg);
        const std::string aSide = text(*c, "look_side", "");
        if (!aSide.empty()) s.mLookSign = aSide == "left" ? -1 : 1;
        const std::string aPass = text(*c, "pass", "");
        if (!aPass.empty()) s.mAscending = aPass == "ascending";
    }
    if (const CJson* d = member(j, "doppler")) s.mDopplerCentroid = num(*d, "centroid", s.mDopplerCentroid);
    if (const CJson* l = member(j, "levels")) {
        s.mSnrDb = num(*l, "snr_db", s.mSnrDb);
        if (l->has("noise") && !(*l)["noise"].isNull()) s.mNoise = (*l)["noise"].boolean();
    }
    if (const CJson* g = member(j, "grid")) {
        s.mGrid.mRows = static_cast<int>(num(*g, "rows", s.mGrid.mRows));
        s.mGrid.mCols = static_cast<int>(num(*g, "cols", s.mGrid.mCols));
    }
    if (const CJson* c = member(j, "scatterers")) {
        s.mScatterers = static_cast<long>(num(*c, "count", static_cast<double>(s.mScatterers)));
        s.mScattererRms = num(*c, "rms", s.mScattererRms);
        s.mScattererMargin = static_cast<long>(num(*c, "margin_lines", static_cast<double>(s.mScattererMargin)));
    }
    if (j.has("targets") && j["targets"].isArray()) {
        s.mTargets.clear();
        for (std::size_t i = 0; i < j["targets"].size(); ++i) s.mTargets.push_back(parseTarget(s, j["targets"][i], i));
    }
    if (const CJson* e = member(j, "events")) applyFaults(s, *e);
}

std::unique_ptr<CSimOrbit> fqorvSimMakeOrbit(const CSimScene& theScene)
{
    if (theScene.mHasKepler) return std::make_unique<CSimKeplerOrbit>(theScene.mKepler);
    return std::make_unique<CSimVectorOrbit>(theScene.mVectorTimes, theScene.mVectors);
}

void fqorvSimCompleteScene(CSimScene& s)
{
    CSimRadar& r = s.mRadar;
    completeNative(s);
    if (r.mPrf <= 0.0) {
        if (r.mPriCode <= 0) throw std::runtime_error("the PRI code must be positive");
        r.mPrf = fqorvSimPrfOfCode(s.mPrefix, r.mSamplingRate, r.mPriCode);
    }
    const int aReplica = fqorvSimReplicaPoints(r);
    if (s.mPulses < 2) throw std::runtime_error("a scene needs at least 2 lines");
    if (s.mSamples <= aReplica + 16)
        throw std::runtime_error("a line of " + std::to_string(s.mSamples) + " samples cannot hold the chirp of " +
                                 std::to_string(aReplica) + " samples and a swath");
    if (s.mSamples > 900000 || s.mPulses > 900000) throw std::runtime_error("a raster holds at most 900000 lines and samples");
    if (!(r.mAntennaLength > 0.0) || !(r.mPatternExtent > 0.0)) throw std::runtime_error("antenna length and pattern extent must be positive");
    if (std::fabs(r.wavelength() * s.mDopplerCentroid / 15000.0) >= 1.0)
        throw std::runtime_error("the Doppler centroid is beyond any squint");

    const CSimVec3 aCentre = fqorvSimGeodeticToEcef(s.mEllipsoid, s.mCentreLat * CQORV_SIM_DEG,
                                                    s.mCentreLon * CQORV_SIM_DEG, s.mCentreHeight);
    if (s.mHasKepler && !s.mOrbitPlaced) {
        s.mKepler.mThetaG0 = fqorvSimGreenwichAngle(s.mEpoch);
        if (!fqorvSimPlaceOrbit(s.mKepler, aCentre, s.mIncidenceDeg * CQORV_SIM_DEG, s.mLookSign, s.mAscending,
                                s.mEllipsoid))
            throw std::runtime_error("no orbit of these elements sees the scene centre at the incidence asked");
        s.mOrbitPlaced = true;
    }
    const std::unique_ptr<CSimOrbit> aOrbit = fqorvSimMakeOrbit(s);
    const CSimGeometry g(*aOrbit, r.wavelength(), s.mDopplerCentroid);
    const double t0 = g.zeroDopplerTime(aCentre, 0.0);
    if (!std::isfinite(t0) || std::fabs(t0) > 600.0)
        throw std::runtime_error("the orbit does not pass the scene centre within 600 s of the epoch");
    deriveWindow(s, g.range(t0, aCentre));
    const double aBeamCentre = g.beamCentreTime(aCentre, t0);
    if (std::isnan(s.mStartTime)) s.mStartTime = aBeamCentre - 0.5 * s.mPulses / r.mPrf;
    checkFaults(s);

    const CSimTimeline aTimeline(s);
    for (CSimTarget& t : s.mTargets)
        if (t.mFromImage) {
            const double aNear = 0.5 * CQORV_SIM_LIGHT * s.mTauFirst;
            t.mEcef = g.locate(aTimeline.timeOfPulse(t.mLine), aNear + t.mPixel * r.rangeSpacing(), t.mHeight,
                               s.mLookSign, s.mEllipsoid);
            t.mFromImage = false;
        }
    const bool aHasListed = std::any_of(s.mTargets.begin(), s.mTargets.end(), [](const CSimTarget& t) { return t.mListed; });
    if (!aHasListed && s.mGrid.mRows > 0 && s.mGrid.mCols > 0)
        placeGrid(s, g, aTimeline, g.dopplerRate(aBeamCentre, aCentre));
    const bool aHasScatterers = std::any_of(s.mTargets.begin(), s.mTargets.end(), [](const CSimTarget& t) { return !t.mListed; });
    if (!aHasScatterers && s.mScatterers > 0) placeScatterers(s, g, aTimeline);
}
