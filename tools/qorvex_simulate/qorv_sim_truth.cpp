#include "qorv_sim_truth.h"

#include <algorithm>
#include <cmath>

#include "qorv_sim_geometry.h"

namespace {

constexpr double CQORV_SIM_LIGHT = 299792458.0;

double wrapDegrees(double theAngle)
{
    double a = std::fmod(theAngle + 180.0, 360.0);
    if (a < 0.0) a += 360.0;
    return a - 180.0;
}

/// Truth of one target: zero-Doppler and beam-centre geometry, its place in the image, the
/// processed aperture and the effective velocity over it.
CSimTargetTruth targetTruth(const CSimScene& s, const CSimGeometry& g, const CSimTimeline& tl, const CSimTarget& t,
                            double theGuess)
{
    const double aPrf = s.mRadar.mPrf;
    CSimTargetTruth r;
    r.mTarget = &t;
    fqorvSimEcefToGeodetic(s.mEllipsoid, t.mEcef, r.mLat, r.mLon, r.mHeight);
    r.mLat /= CQORV_SIM_DEG;
    r.mLon /= CQORV_SIM_DEG;
    r.mZeroDopplerTime = g.zeroDopplerTime(t.mEcef, theGuess);
    r.mSlantRange = g.range(r.mZeroDopplerTime, t.mEcef);
    r.mExpectedLine = tl.fractionalPulse(r.mZeroDopplerTime);
    r.mExpectedPixel = (r.mSlantRange - 0.5 * CQORV_SIM_LIGHT * s.mTauFirst) / s.mRadar.rangeSpacing();
    r.mBeamCentreTime = g.beamCentreTime(t.mEcef, r.mZeroDopplerTime);
    r.mDopplerCentroid = g.doppler(r.mBeamCentreTime, t.mEcef);
    r.mFmRate = g.dopplerRate(r.mBeamCentreTime, t.mEcef);
    r.mVrZeroDoppler = g.effectiveVelocityAtZeroDoppler(t.mEcef, r.mZeroDopplerTime);
    const double tA = g.timeOfDoppler(t.mEcef, s.mDopplerCentroid + 0.4 * aPrf, r.mBeamCentreTime);
    const double tB = g.timeOfDoppler(t.mEcef, s.mDopplerCentroid - 0.4 * aPrf, r.mBeamCentreTime);
    r.mVrFit = g.effectiveVelocityFit(t.mEcef, r.mZeroDopplerTime, tA, tB);
    r.mApertureFirst = tl.fractionalPulse(tA);
    r.mApertureLast = tl.fractionalPulse(tB);
    r.mFullAperture = r.mApertureFirst >= 0.0 && r.mApertureLast <= static_cast<double>(s.mPulses - 1);
    for (long p : s.mFaults.mDroppedPulses)
        if (p >= r.mApertureFirst && p <= r.mApertureLast) r.mGapInAperture = true;
    const double aCycles = 2.0 * r.mSlantRange / s.mRadar.wavelength();  // f0 tau0, whole cycles dropped first
    r.mExpectedPhaseDeg = wrapDegrees(t.mPhaseDeg - 360.0 * (aCycles - std::floor(aCycles)));
    return r;
}

CJson vecJson(const CSimVec3& v) { return CJson(std::vector<double>{v.x, v.y, v.z}); }

CJson targetJson(const CSimScene& s, const CSimTargetTruth& r)
{
    const CSimTarget& t = *r.mTarget;
    CJson j = CJson::object();
    j["id"] = t.mId;
    j["isolated"] = r.mIsolated;
    j["amplitude"] = t.mAmplitude;
    j["phase_deg"] = t.mPhaseDeg;
    j["lat"] = r.mLat;
    j["lon"] = r.mLon;
    j["h"] = r.mHeight;
    j["ecef"] = vecJson(t.mEcef);
    j["zero_doppler_time"] = r.mZeroDopplerTime;
    j["zero_doppler_utc"] = fqorvSimHeaderDate(s.mEpoch.plus(r.mZeroDopplerTime));
    j["slant_range"] = r.mSlantRange;
    j["expected_line"] = r.mExpectedLine;
    j["expected_pixel"] = r.mExpectedPixel;
    j["expected_phase_deg"] = r.mExpectedPhaseDeg;
    j["expected_phase_fd_deg"] = wrapDegrees(r.mExpectedPhaseDeg + (r.mFmRate < 0.0 ? -45.0 : 45.0));
    j["doppler_centroid"] = r.mDopplerCentroid;
    const double aAmb = std::round(r.mDopplerCentroid / s.mRadar.mPrf);
    j["ambiguity"] = aAmb;
    j["doppler_baseband"] = r.mDopplerCentroid - aAmb * s.mRadar.mPrf;
    j["fm_rate_beam_centre"] = r.mFmRate;
    j["beam_centre_time"] = r.mBeamCentreTime;
    j["vr_zero_doppler"] = r.mVrZeroDoppler;
    j["vr_fit_aperture"] = r.mVrFit;
    j["processed_aperture_lines"] = CJson(std::vector<double>{r.mApertureFirst, r.mApertureLast});
    j["full_aperture"] = r.mFullAperture;
    j["gap_in_aperture"] = r.mGapInAperture;
    return j;
}

}  // namespace

CSimSceneTruth fqorvSimComputeTruth(const CSimScene& s, const CSimOrbit& theOrbit, const CSimTimeline& tl)
{
    const CSimGeometry g(theOrbit, s.mRadar.wavelength(), s.mDopplerCentroid);
    CSimSceneTruth r;
    r.mNearRange = 0.5 * CQORV_SIM_LIGHT * s.mTauFirst;
    r.mCompressedWidth = s.mSamples - fqorvSimReplicaPoints(s.mRadar);
    const double aMiddle = tl.timeOfPulse(0.5 * s.mPulses);

    // The image centre: the ground point at the middle line and the middle of the compressed swath.
    r.mCentreZeroDopplerTime = aMiddle;
    r.mCentreRange = r.mNearRange + 0.5 * r.mCompressedWidth * s.mRadar.rangeSpacing();
    r.mCentre = g.locate(aMiddle, r.mCentreRange, s.mCentreHeight, s.mLookSign, s.mEllipsoid);
    fqorvSimEcefToGeodetic(s.mEllipsoid, r.mCentre, r.mCentreLat, r.mCentreLon, r.mCentreHeight);
    r.mCentreLat /= CQORV_SIM_DEG;
    r.mCentreLon /= CQORV_SIM_DEG;
    r.mCentreLine = tl.fractionalPulse(aMiddle);
    r.mCentrePixel = 0.5 * r.mCompressedWidth;
    const CSimState aSat = theOrbit.state(aMiddle);
    r.mIncidenceDeg = fqorvSimIncidenceAngle(aSat.mPos, r.mCentre, s.mEllipsoid) / CQORV_SIM_DEG;
    r.mLookAngleDeg = fqorvSimLookAngle(aSat.mPos, r.mCentre) / CQORV_SIM_DEG;
    r.mHeadingDeg = fqorvSimHeading(r.mCentre, aSat.mVel, s.mEllipsoid);
    const CSimVec3 a = g.locate(aMiddle - 0.5, r.mCentreRange, s.mCentreHeight, s.mLookSign, s.mEllipsoid);
    const CSimVec3 b = g.locate(aMiddle + 0.5, r.mCentreRange, s.mCentreHeight, s.mLookSign, s.mEllipsoid);
    r.mGroundVelocity = (b - a).norm();
    r.mCentreBeamCentreTime = g.beamCentreTime(r.mCentre, aMiddle);
    r.mFmRate = g.dopplerRate(r.mCentreBeamCentreTime, r.mCentre);
    r.mVrZeroDoppler = g.effectiveVelocityAtZeroDoppler(r.mCentre, aMiddle);
    const double tA = g.timeOfDoppler(r.mCentre, s.mDopplerCentroid + 0.4 * s.mRadar.mPrf, r.mCentreBeamCentreTime);
    const double tB = g.timeOfDoppler(r.mCentre, s.mDopplerCentroid - 0.4 * s.mRadar.mPrf, r.mCentreBeamCentreTime);
    r.mProcessingVelocity = g.effectiveVelocityFit(r.mCentre, aMiddle, tA, tB);

    for (const CSimTarget& t : s.mTargets)
        if (t.mListed) r.mTargets.push_back(targetTruth(s, g, tl, t, aMiddle));
    // Isolated: no other listed target within 64 lines and 32 pixels of the expected peak.
    for (std::size_t i = 0; i < r.mTargets.size(); ++i)
        for (std::size_t j = 0; j < r.mTargets.size(); ++j)
            if (i != j && std::fabs(r.mTargets[i].mExpectedLine - r.mTargets[j].mExpectedLine) < 64.0 &&
                std::fabs(r.mTargets[i].mExpectedPixel - r.mTargets[j].mExpectedPixel) < 32.0)
                r.mTargets[i].mIsolated = false;
    return r;
}

CSimStateVectors fqorvSimStateVectors(const CSimScene& s, const CSimOrbit& theOrbit, const CSimTimeline& tl,
                                      double theStep, int theMinimum)
{
    CSimStateVectors v;
    v.mStep = theStep;
    const double aStart = tl.pulseTime(0), aEnd = tl.pulseTime(s.mPulses - 1);
    // The first vector on a whole second of UTC, at least two steps before the first line.
    const double aFirstOfDay = std::floor(s.mEpoch.mSeconds + aStart - 2.0 * theStep);
    v.mFirst = aFirstOfDay - s.mEpoch.mSeconds;
    int n = static_cast<int>(std::ceil((aEnd + 2.0 * theStep - v.mFirst) / theStep)) + 1;
    while (n < theMinimum) {  // widen on both sides
        v.mFirst -= theStep;
        n += 2;
    }
    v.mStates = fqorvSimSampleOrbit(theOrbit, v.mFirst, theStep, n);
    return v;
}

namespace {

CJson radarJson(const CSimScene& s, const CSimSceneTruth& t)
{
    const CSimRadar& r = s.mRadar;
    CJson rad = CJson::object();
    rad["f0"] = r.mCarrier;
    rad["wavelength"] = r.wavelength();
    rad["bandwidth"] = r.mBandwidth;
    rad["pulse_length"] = r.mPulseLength;
    rad["sampling_rate"] = r.mSamplingRate;
    rad["chirp_rate"] = r.chirpRate();
    rad["chirp"] = r.mUpChirp ? "up" : "down";
    rad["prf"] = r.mPrf;
    rad["pri_code"] = r.mPriCode;
    rad["range_spacing"] = r.rangeSpacing();
    rad["replica_points"] = fqorvSimReplicaPoints(r);
    rad["compressed_width"] = t.mCompressedWidth;
    rad["antenna_length"] = r.mAntennaLength;
    rad["pattern_extent"] = r.mPatternExtent;
    rad["sensor"] = r.mSensorName;
    rad["polarisation"] = r.mPolarisation;
    return rad;
}

CJson conventionsJson(const CSimScene& s)
{
    CJson c = CJson::object();
    c["carrier_sign"] = -1;
    c["spectrum"] = "NORMAL";
    c["chirp"] = s.mRadar.mUpChirp ? "up" : "down";
    c["timing"] = "stopgo";
    c["ellipsoid_axes"] = CJson(std::vector<double>{s.mEllipsoid.mA, s.mEllipsoid.mB});
    c["echo"] = "p(t - tau) * exp(-j*2*pi*f0*tau), p(t)=exp(j*2*pi*(K*t/2+fstart)*t), 0<=t<=T, fstart=-K*T/2";
    c["range_history"] = "tau = 2 R(t_k)/c, R at the transmit time t_k of the pulse (stop and go)";
    c["doppler"] = "f = 2 v.u / lambda, u satellite->target: positive approaching";
    c["antenna"] = "two-way amplitude sinc(L sin(psi)/lambda)^2, sinc(x)=sin(pi x)/(pi x), psi = asin(v^.u) - asin(lambda fdc/(2|v|))";
    c["line_time"] = "line k <-> t_start + k/PRF (pulse transmit time); lines counted in pulses, drops and repeats undone";
    c["pixel"] = "compressed pixel n <-> slant range r_near + n*c/(2fs), r_near = c*tau_first/2 of the first line's window";
    c["expected_phase"] = "phase_deg - 360*f0*2*R0/c: the peak phase of an exact matched filter";
    c["expected_phase_fd"] = "expected_phase -45 deg (fm rate < 0): focusers that keep the stationary-phase constant";
    return c;
}

CJson rasterJson(const CSimScene& s, const CSimTimeline& tl, const CSimRunFigures& f)
{
    CJson ras = CJson::object();
    ras["file"] = f.mRasterName;
    ras["header"] = f.mHeaderName;
    ras["cell_type"] = s.cellTypeName();
    ras["samples"] = s.mSamples;
    ras["pulses"] = s.mPulses;
    ras["records"] = static_cast<long>(tl.records().size());
    ras["prefix"] = s.mPrefix.mSize;
    ras["header_offset"] = s.mHeaderOffset;
    const int aBytes = s.mFormat == CSimSampleFormat::Ubyte5Bit ? 2 : 8;
    ras["record_length"] = s.mPrefix.mSize + aBytes * s.mSamples;
    ras["format"] = s.mFormat == CSimSampleFormat::Ubyte5Bit ? std::to_string(s.mCodeBits) + "bit" : "baq4";
    if (s.mFormat == CSimSampleFormat::Ubyte5Bit) {
        ras["offset_dn"] = (1 << (s.mCodeBits - 1)) - 0.5;
        ras["rms_dn"] = s.mRmsDn * (1 << (s.mCodeBits - 5));
        ras["scale"] = f.mGain;
    } else {
        ras["baq_block"] = 64;
    }
    ras["clipped_fraction"] = f.mClippedFraction;
    ras["counter0"] = s.mCounter0;
    ras["counter_pos"] = s.mPrefix.mCounterPos;
    ras["swst_pos"] = s.mPrefix.mSwstPos;
    ras["pri_pos"] = s.mPrefix.mPriPos;
    ras["range_pos"] = s.mPrefix.mRangePos;
    return ras;
}

CJson eventsJson(const CSimScene& s, const CSimTimeline& tl)
{
    CJson aDropped = CJson::array(), aRepeated = CJson::array(), aSwst = CJson::array(), aPrf = CJson::array();
    std::vector<long> aDrops = s.mFaults.mDroppedPulses, aReps = s.mFaults.mRepeatedPulses;
    std::sort(aDrops.begin(), aDrops.end());
    std::sort(aReps.begin(), aReps.end());
    for (long p : aDrops) aDropped.push(CJson(p));
    for (long p : aReps) aRepeated.push(CJson(p));
    for (const auto& [p, n] : s.mFaults.mSwstChanges) {
        CJson e = CJson::object();
        e["pulse"] = p;
        e["record"] = tl.recordOfPulse(p);
        e["codes"] = n;
        e["code_after"] = tl.swstCode(p);
        e["window_shift_samples"] = tl.windowShiftSamples(p);
        aSwst.push(e);
    }
    for (const auto& [p, code] : s.mFaults.mPrfChanges) {
        CJson e = CJson::object();
        e["pulse"] = p;
        e["record"] = tl.recordOfPulse(p);
        e["pri_code"] = code;
        e["prf"] = tl.prf(p);
        e["time"] = tl.pulseTime(p);
        aPrf.push(e);
    }
    CJson ev = CJson::object();
    ev["dropped_pulses"] = aDropped;
    ev["repeated_pulses"] = aRepeated;
    ev["swst_changes"] = aSwst;
    ev["prf_changes"] = aPrf;
    return ev;
}

CJson orbitJson(const CSimScene& s, const CSimTimeline& tl, const CSimOrbit& theOrbit)
{
    CJson o = CJson::object();
    if (s.mHasKepler) {
        CJson& k = o["kepler"] = CJson::object();
        k["a"] = s.mKepler.mA;
        k["e"] = s.mKepler.mE;
        k["inc_deg"] = s.mKepler.mInc / CQORV_SIM_DEG;
        k["raan_deg"] = s.mKepler.mRaan / CQORV_SIM_DEG;
        k["argp_deg"] = s.mKepler.mArgp / CQORV_SIM_DEG;
        k["m0_deg"] = s.mKepler.mM0 / CQORV_SIM_DEG;
        k["theta_g0"] = s.mKepler.mThetaG0;
        k["mu"] = s.mKepler.mMu;
        k["omega_earth"] = s.mKepler.mOmegaEarth;
    }
    const CSimStateVectors sv = fqorvSimStateVectors(s, theOrbit, tl);
    CJson& v = o["state_vectors"] = CJson::object();
    CJson aTimes = CJson::array(), aPos = CJson::array(), aVel = CJson::array();
    for (std::size_t i = 0; i < sv.mStates.size(); ++i) {
        aTimes.push(CJson(sv.mFirst + i * sv.mStep));
        aPos.push(vecJson(sv.mStates[i].mPos));
        aVel.push(vecJson(sv.mStates[i].mVel));
    }
    v["times"] = aTimes;
    v["pos"] = aPos;
    v["vel"] = aVel;
    v["time_first"] = fqorvSimHeaderDate(s.mEpoch.plus(sv.mFirst));
    v["spacing"] = sv.mStep;
    v["frame"] = "ECR";
    return o;
}

CJson sceneCentreJson(const CSimScene& s, const CSimSceneTruth& t)
{
    CJson sc = CJson::object();
    sc["lat"] = t.mCentreLat;
    sc["lon"] = t.mCentreLon;
    sc["h"] = t.mCentreHeight;
    sc["ecef"] = vecJson(t.mCentre);
    sc["slant_range"] = t.mCentreRange;
    sc["incidence_deg"] = t.mIncidenceDeg;
    sc["look_angle_deg"] = t.mLookAngleDeg;
    sc["heading_deg"] = t.mHeadingDeg;
    sc["look_side"] = s.mLookSign > 0 ? "right" : "left";
    sc["pass"] = s.mAscending ? "ascending" : "descending";
    sc["ground_velocity"] = t.mGroundVelocity;
    sc["azimuth_spacing_ground"] = t.mGroundVelocity / s.mRadar.mPrf;
    sc["zero_doppler_time"] = t.mCentreZeroDopplerTime;
    sc["beam_centre_time"] = t.mCentreBeamCentreTime;
    sc["expected_line"] = t.mCentreLine;
    sc["expected_pixel"] = t.mCentrePixel;
    return sc;
}

}  // namespace

CJson fqorvSimTruthJson(const CSimScene& s, const CSimSceneTruth& t, const CSimTimeline& tl, const CSimOrbit& theOrbit,
                        const CSimRunFigures& f)
{
    const CSimRadar& r = s.mRadar;
    CJson j = CJson::object();
    CJson& sim = j["simulator"] = CJson::object();
    sim["name"] = "qorvex_simulate";
    sim["version"] = "1.0";
    sim["seed"] = static_cast<double>(s.mSeed);
    sim["preset"] = s.mPreset;
    sim["sensor"] = r.mSensorName;
    sim["lines"] = s.mPulses;
    sim["samples"] = s.mSamples;
    j["conventions"] = conventionsJson(s);
    j["radar"] = radarJson(s, t);
    j["raster"] = rasterJson(s, tl, f);

    CJson& w = j["window"] = CJson::object();
    w["tau_first"] = s.mTauFirst;
    w["r_near"] = t.mNearRange;
    w["swst_code0"] = s.mSwstCode0;
    w["samples_per_swst_code"] = s.mPrefix.mSwstSamplesPerCode;
    j["events"] = eventsJson(s, tl);

    CJson& tm = j["timing"] = CJson::object();
    tm["epoch_utc"] = fqorvSimIsoDate(s.mEpoch);
    tm["t_start"] = s.mStartTime;
    tm["azimuth_start_time"] = fqorvSimHeaderDate(s.mEpoch.plus(s.mStartTime));
    tm["azimuth_stop_time"] = fqorvSimHeaderDate(s.mEpoch.plus(tl.pulseTime(s.mPulses - 1)));
    tm["line_time"] = 1.0 / r.mPrf;
    j["orbit"] = orbitJson(s, tl, theOrbit);
    j["scene_centre"] = sceneCentreJson(s, t);

    CJson& d = j["doppler"] = CJson::object();
    const double aAmb = std::round(s.mDopplerCentroid / r.mPrf);
    d["centroid"] = s.mDopplerCentroid;
    d["ambiguity"] = aAmb;
    d["baseband"] = s.mDopplerCentroid - aAmb * r.mPrf;
    d["fm_rate"] = t.mFmRate;
    d["written_to_header"] = s.mWriteDoppler;

    CJson& vel = j["velocity"] = CJson::object();
    vel["true_processing_velocity"] = t.mProcessingVelocity;
    vel["vr_zero_doppler"] = t.mVrZeroDoppler;
    vel["header_velocity"] = t.mProcessingVelocity * (1.0 + s.mHeaderVelocityError);

    CJson& lv = j["levels"] = CJson::object();
    lv["noise"] = s.mNoise;
    lv["snr_db"] = s.mNoise ? CJson(s.mSnrDb) : CJson();
    lv["snr_definition"] = "A^2 * range_gain_unweighted * azimuth_gain_unweighted / noise_std^2 for a unit target";
    lv["noise_std"] = std::sqrt(f.mNoiseVariance);
    lv["range_gain_unweighted"] = f.mRangeGain;
    lv["azimuth_gain_unweighted"] = f.mAzimuthGain;
    lv["signal_power"] = f.mSignalPower;

    CJson& cl = j["scatterers"] = CJson::object();
    cl["count"] = s.mScatterers;
    cl["rms"] = s.mScattererRms;
    cl["margin_lines"] = s.mScattererMargin;

    CJson aTargets = CJson::array();
    for (const CSimTargetTruth& tt : t.mTargets) aTargets.push(targetJson(s, tt));
    j["targets"] = aTargets;
    return j;
}
