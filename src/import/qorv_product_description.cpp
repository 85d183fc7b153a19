#include "qorv_product_description.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <stdexcept>

#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"

namespace {

/// ERS, ENVISAT and ALOS look to the right of their tracks.
constexpr int CQORV_LOOK_SIGN = +1;
/// A single state vector is propagated at most this far (s): beyond, drag and the higher terms of
/// the field make the propagated orbit worse than none.
constexpr double CQORV_MAX_PROPAGATION = 3600.0;
/// Spacing (s) of the vectors written for a propagated or resampled orbit, and the margin they
/// keep beyond the first and last pulse.
constexpr double CQORV_VECTOR_STEP = 5.0;
constexpr double CQORV_VECTOR_MARGIN = 10.0;
/// The chain fits a polynomial of degree 4 to the vectors: at least five.
constexpr int CQORV_MIN_VECTORS = 5;

std::string format(const char* theFormat, double a, double b = 0.0, double c = 0.0, double d = 0.0)
{
    char s[256];
    std::snprintf(s, sizeof s, theFormat, a, b, c, d);
    return s;
}

/// A stated value when it is finite, the format's constant (named in theDefaults) when the archive
/// states none; either way it must lie in [theMin, theMax].
double statedOr(double theStated, double theConstant, double theMin, double theMax, const char* theWhat,
                const char* theUnit, double theScale, std::vector<std::string>& theDefaults)
{
    double v = theStated;
    if (!std::isfinite(v)) {
        v = theConstant;
        theDefaults.push_back(std::string(theWhat) + " " + format("%.10g", v * theScale) + " " + theUnit);
    }
    if (!(std::fabs(v) >= theMin && std::fabs(v) <= theMax))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, std::string(theWhat) + " " + format("%.10g", v * theScale) + " " + theUnit +
                                                    format(" is outside %.6g .. %.6g ", theMin * theScale, theMax * theScale) + theUnit);
    return v;
}

/// A value the archive must state (ASAR, ALOS: no constants stand in); it must lie in
/// [theMin, theMax].
double stated(double theStated, double theMin, double theMax, const char* theWhat, const char* theUnit, double theScale)
{
    if (!std::isfinite(theStated)) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, std::string("the archive states no ") + theWhat);
    std::vector<std::string> aNone;
    return statedOr(theStated, theStated, theMin, theMax, theWhat, theUnit, theScale, aNone);
}

// ------------------------------------------------------------------------------------------------
// Stage 1: the radar and the window of the first line

/// ERS: the archive's values, the image mode's constants where it states none; the window opens
/// SWST codes of 4 samples after the echo of the pulse sent RANK pulses before, less the delay
/// bias of the instrument.
void describeErsRadar(const CNativeArchive& a, const CPlannedProduct& p, CProductDescription& d)
{
    const double c = CQORV_LIGHT_SPEED;
    std::vector<std::string> aDefaults;
    const double aWavelength = statedOr(a.mWavelength, c / NQORV_ERS::CARRIER, 0.015, 0.3, "wavelength", "m", 1.0, aDefaults);
    d.mCarrier = c / aWavelength;
    d.mSamplingRate = statedOr(a.mSamplingRate, NQORV_ERS::SAMPLING_RATE, 1e6, 1e9, "sampling rate", "MHz", 1e-6, aDefaults);
    d.mChirpRate = statedOr(a.mChirpRate, NQORV_ERS::CHIRP_RATE, 1e9, 1e15, "chirp rate", "Hz/s", 1.0, aDefaults);
    d.mPulseLength = statedOr(a.mPulseLength, NQORV_ERS::PULSE_LENGTH, 1e-7, 1e-3, "pulse length", "us", 1e6, aDefaults);
    if (!aDefaults.empty()) {
        std::string aList;
        for (const std::string& x : aDefaults) aList += (aList.empty() ? "" : ", ") + x;
        d.mNotes.push_back("the ERS image mode's values where the archive states none: " + aList);
    }
    d.mBandwidth = std::fabs(d.mChirpRate) * d.mPulseLength;
    d.mFirstDelay = p.mFirstSwst * NQORV_ERS::SWST_SAMPLES_PER_CODE / d.mSamplingRate + NQORV_ERS::RANK / p.mPrf -
                    NQORV_ERS::DELAY_BIAS;
}

/// ASAR: everything from the instrument file and the packets. The window opens SWST samples after
/// the echo of the pulse sent rank pulses before (the rank of the beam set), less the range gate
/// bias; the chirp rises.
void describeAsarRadar(const CNativeArchive& a, const CPlannedProduct& p, CProductDescription& d)
{
    d.mCarrier = stated(a.mCarrier, 1e9, 1e11, "carrier frequency", "GHz", 1e-9);
    d.mSamplingRate = stated(a.mSamplingRate, 1e6, 1e9, "sampling rate", "MHz", 1e-6);
    d.mPulseLength = stated(a.mPulseLength, 1e-7, 1e-3, "pulse length", "us", 1e6);
    d.mBandwidth = stated(a.mBandwidth, 1e5, 1e9, "chirp bandwidth", "MHz", 1e-6);
    d.mChirpRate = d.mBandwidth / d.mPulseLength;
    if (a.mRank < 1) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, "the instrument file gives no rank for the beam set");
    const double aBias = stated(a.mRangeGateBias, 0.0, 1e-3, "range gate bias", "us", 1e6);
    d.mFirstDelay = (p.mFirstSwst + static_cast<double>(a.mRank) * p.mPriCode) / d.mSamplingRate - aBias;
}

/// ALOS: the window's first sample lies at the slant range every record states; the chirp falls.
void describeAlosRadar(const CNativeArchive& a, const CPlannedProduct& p, CProductDescription& d)
{
    const double c = CQORV_LIGHT_SPEED;
    d.mCarrier = c / stated(a.mWavelength, 0.015, 0.3, "wavelength", "m", 1.0);
    d.mSamplingRate = stated(a.mSamplingRate, 1e6, 1e9, "sampling rate", "MHz", 1e-6);
    d.mPulseLength = stated(a.mPulseLength, 1e-7, 1e-3, "pulse length", "us", 1e6);
    // The calibration record states the chirp's bandwidth; where it does not, the chirp rate serves.
    d.mBandwidth = std::isfinite(a.mBandwidth) ? a.mBandwidth : std::fabs(a.mChirpRate) * d.mPulseLength;
    d.mBandwidth = stated(d.mBandwidth, 1e5, 1e9, "chirp bandwidth", "MHz", 1e-6);
    d.mChirpRate = -d.mBandwidth / d.mPulseLength;
    if (p.mFirstRange <= 0) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, "no slant range of the first sample");
    d.mFirstDelay = 2.0 * p.mFirstRange / c;
}

void describeRadar(const CNativeArchive& a, const CPlannedProduct& p, CProductDescription& d)
{
    const double c = CQORV_LIGHT_SPEED;
    switch (a.mFamily) {
    case ENativeFamily::Asar: describeAsarRadar(a, p, d); break;
    case ENativeFamily::Alos: describeAlosRadar(a, p, d); break;
    default: describeErsRadar(a, p, d); break;
    }
    if (d.mBandwidth > d.mSamplingRate)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, format("chirp bandwidth %.6g MHz above the sampling rate %.6g MHz",
                                                       d.mBandwidth * 1e-6, d.mSamplingRate * 1e-6));
    d.mPrf = p.mPrf;
    if (std::isfinite(a.mPrf) && std::fabs(a.mPrf - p.mPrf) > 0.01)
        d.mNotes.push_back(format("PRF %.7f Hz of the lines; the archive states %.7f Hz", p.mPrf, a.mPrf));
    d.mSamples = p.mSamples > 0 ? p.mSamples : a.mLayout.mSamples;
    if (!(d.mFirstDelay > 0.0))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE,
                        format("the window of the first line opens %.6g us after its pulse", d.mFirstDelay * 1e6));
    d.mRangeSpacing = 0.5 * c / d.mSamplingRate;
    d.mNearRange = 0.5 * c * d.mFirstDelay;
    d.mCentreRange = d.mNearRange + 0.5 * d.mSamples * d.mRangeSpacing;
    d.mFarRange = d.mNearRange + (d.mSamples - 1) * d.mRangeSpacing;
    // Range compression keeps the samples the whole chirp covers: the focused image is the window
    // less the chirp's length.
    const int aCompressed = std::max(1, d.mSamples - static_cast<int>(std::ceil(d.mSamplingRate * d.mPulseLength)));
    d.mSceneRange = d.mNearRange + 0.5 * aCompressed * d.mRangeSpacing;
    d.mStartTime = p.mFirstPulseTime;
    d.mStopTime = p.mFirstPulseTime + static_cast<double>(p.mPulses - 1) / d.mPrf;
}

// ------------------------------------------------------------------------------------------------
// Stage 2: the orbit and its vectors for the header

bool evenlySpaced(const std::vector<CStateVector>& v, double& theStep)
{
    if (v.size() < 2) return false;
    theStep = (v.back().mTime - v.front().mTime) / static_cast<double>(v.size() - 1);
    for (std::size_t i = 1; i < v.size(); ++i)
        if (std::fabs(v[i].mTime - v[i - 1].mTime - theStep) > 1e-3) return false;
    return true;
}

std::string timeSpan(double theFirst, double theLast) { return format("%.3f s to %.3f s of the day", theFirst, theLast); }

/// Vectors every CQORV_VECTOR_STEP from a whole second before the first pulse's margin to past the
/// last pulse's.
std::vector<double> vectorGrid(double theStart, double theStop)
{
    const double aFirst = std::floor(theStart - CQORV_VECTOR_MARGIN);
    const int n = std::max(CQORV_MIN_VECTORS + 2,
                           static_cast<int>(std::ceil((theStop + CQORV_VECTOR_MARGIN - aFirst) / CQORV_VECTOR_STEP)) + 1);
    std::vector<double> t(static_cast<std::size_t>(n));
    for (int i = 0; i < n; ++i) t[static_cast<std::size_t>(i)] = aFirst + i * CQORV_VECTOR_STEP;
    return t;
}

/// The orbit of a product from several vectors: they must cover every pulse, with one spacing of
/// extrapolation at each end. The header gets them as they are when they are evenly spaced (the
/// ones around the product, at least five), resampled every 5 s otherwise.
CStateVectorOrbit orbitFromVectors(const std::vector<CStateVector>& v, CProductDescription& d)
{
    std::vector<CStateVector> aSorted = v;
    for (std::size_t i = 1; i < aSorted.size(); ++i)
        if (!(aSorted[i].mTime > aSorted[i - 1].mTime))
            fqorvImportFail(CQORV_ERR_IMPORT_TIME_ORDER,
                            format("state vector %.0f at %.3f s follows one at %.3f s", static_cast<double>(i),
                                   aSorted[i].mTime, aSorted[i - 1].mTime));
    const double aSpacing = (aSorted.back().mTime - aSorted.front().mTime) / static_cast<double>(aSorted.size() - 1);
    if (d.mStartTime < aSorted.front().mTime - aSpacing || d.mStopTime > aSorted.back().mTime + aSpacing)
        fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_COVERAGE, "the orbit covers " + timeSpan(aSorted.front().mTime, aSorted.back().mTime) +
                                                             ", the lines run from " + timeSpan(d.mStartTime, d.mStopTime));
    CStateVectorOrbit aOrbit(aSorted);
    double aStep = 0.0;
    if (evenlySpaced(aSorted, aStep)) {
        // The vectors within two spacings of the product, widened to five where the archive has them.
        std::size_t a = 0, b = aSorted.size();
        while (a + 1 < b && aSorted[a + 1].mTime < d.mStartTime - 2.0 * aStep) ++a;
        while (b > a + 1 && aSorted[b - 2].mTime > d.mStopTime + 2.0 * aStep) --b;
        while (b - a < CQORV_MIN_VECTORS && (a > 0 || b < aSorted.size())) {
            if (a > 0) --a;
            if (b - a < CQORV_MIN_VECTORS && b < aSorted.size()) ++b;
        }
        if (b - a >= CQORV_MIN_VECTORS) {
            d.mStateVectors.assign(aSorted.begin() + static_cast<long>(a), aSorted.begin() + static_cast<long>(b));
            d.mStateVectorStep = aStep;
            return aOrbit;
        }
    }
    const std::vector<double> aGrid = vectorGrid(d.mStartTime, d.mStopTime);
    d.mStateVectors = aOrbit.resample(aGrid.front(), CQORV_VECTOR_STEP, static_cast<int>(aGrid.size()));
    d.mStateVectorStep = CQORV_VECTOR_STEP;
    d.mNotes.push_back(format("%.0f state vectors every %.0f s interpolated from the orbit's %.0f", static_cast<double>(aGrid.size()),
                              CQORV_VECTOR_STEP, static_cast<double>(aSorted.size())));
    return aOrbit;
}

/// The orbit of a product from one vector: propagated with the J2 field over the product and its
/// margins.
CStateVectorOrbit orbitFromOneVector(const CStateVector& theVector, CProductDescription& d)
{
    const double aMiddle = 0.5 * (d.mStartTime + d.mStopTime);
    if (std::fabs(theVector.mTime - aMiddle) > CQORV_MAX_PROPAGATION)
        fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_COVERAGE,
                        format("the only state vector is %.0f s from the scene (at most %.0f s): give an orbit with --orbit",
                               std::fabs(theVector.mTime - aMiddle), CQORV_MAX_PROPAGATION));
    d.mStateVectors = fqorvPropagateStateVector(theVector, vectorGrid(d.mStartTime, d.mStopTime));
    d.mStateVectorStep = CQORV_VECTOR_STEP;
    d.mWarnings.emplace_back(CQORV_WARN_IMPORT_ONE_VECTOR,
                             format("%.0f state vectors propagated from the one at %.3f s of the day, %.1f s from the scene centre",
                                    static_cast<double>(d.mStateVectors.size()), theVector.mTime, theVector.mTime - aMiddle));
    return CStateVectorOrbit(d.mStateVectors);
}

// ------------------------------------------------------------------------------------------------
// Stage 3: the scene centre

void describeCentre(const CNativeArchive& a, const CStateVectorOrbit& theOrbit, CProductDescription& d)
{
    const double aMiddle = 0.5 * (d.mStartTime + d.mStopTime);
    CZeroDopplerPoint p;
    if (!fqorvZeroDopplerPoint(theOrbit, aMiddle, d.mSceneRange, 0.0, CQORV_LOOK_SIGN, p))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, format("the window (slant range %.3f km at mid swath) reaches no ground from the orbit",
                                                       d.mSceneRange * 1e-3));
    d.mCentreLatitude = p.mLatitudeDeg;
    d.mCentreLongitude = p.mLongitudeDeg;
    d.mIncidenceDeg = p.mIncidenceDeg;
    d.mLookDeg = p.mLookDeg;
    d.mHeadingDeg = p.mHeadingDeg;
    d.mProcessingVelocity = fqorvEffectiveVelocity(theOrbit, aMiddle, d.mSceneRange, 0.0, CQORV_LOOK_SIGN);
    const COrbitState s = theOrbit.at(aMiddle);
    const double aSpeed = std::sqrt(s.mVelocity[0] * s.mVelocity[0] + s.mVelocity[1] * s.mVelocity[1] + s.mVelocity[2] * s.mVelocity[2]);
    // The effective velocity is about the geometric mean of the satellite's and the beam's ground speed.
    d.mAzimuthSpacing = d.mProcessingVelocity * d.mProcessingVelocity / aSpeed / d.mPrf;
    if (!(d.mIncidenceDeg > 5.0 && d.mIncidenceDeg < 60.0) || !std::isfinite(d.mProcessingVelocity))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, format("incidence %.2f deg and effective velocity %.1f m/s at mid swath: no spaceborne SAR geometry",
                                                       d.mIncidenceDeg, d.mProcessingVelocity));
    // What the archive states of its own centre is a check on the window and the orbit.
    if (std::isfinite(a.mIncidenceDeg) && std::fabs(a.mIncidenceDeg - d.mIncidenceDeg) > 0.5)
        d.mNotes.push_back(format("incidence %.3f deg at the product's centre; the archive states %.3f deg for its scene",
                                  d.mIncidenceDeg, a.mIncidenceDeg));
    if (std::isfinite(a.mCentreLatitude) && std::isfinite(a.mCentreLongitude) &&
        (std::fabs(a.mCentreLatitude - d.mCentreLatitude) > 0.05 ||
         std::fabs(std::remainder(a.mCentreLongitude - d.mCentreLongitude, 360.0)) > 0.05))
        d.mNotes.push_back(format("centre %.4f, %.4f deg from the orbit; the archive states %.4f, %.4f deg for its scene",
                                  d.mCentreLatitude, d.mCentreLongitude, a.mCentreLatitude, a.mCentreLongitude));
}

}  // namespace

CProductDescription fqorvDescribeProduct(const CNativeArchive& theArchive, const CPlannedProduct& theProduct,
                                         const std::vector<CStateVector>& theOutsideOrbit, const std::string& theOrbitName)
{
    CProductDescription d;
    describeRadar(theArchive, theProduct, d);
    const bool aOutside = !theOutsideOrbit.empty();
    const std::vector<CStateVector>& v = aOutside ? theOutsideOrbit : theArchive.mStateVectors;
    d.mOrbitSource = aOutside ? theOrbitName : theArchive.mStateVectorSource;
    if (v.empty()) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, "the archive holds no state vector: give an orbit with --orbit");
    try {
        const CStateVectorOrbit aOrbit = v.size() == 1 ? orbitFromOneVector(v.front(), d) : orbitFromVectors(v, d);
        describeCentre(theArchive, aOrbit, d);
    } catch (const std::invalid_argument& e) {
        fqorvImportFail(CQORV_ERR_IMPORT_TIME_ORDER, e.what());
    }
    return d;
}
