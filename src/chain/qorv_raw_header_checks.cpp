// The physical checks of a raw product's header.
#include "qorv_raw_header_checks.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstring>
#include <memory>

#include "qorv_date.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_identifiers.h"
#include "qorv_read_write_info.h"

namespace {

constexpr double CQORV_C = CQORV_LIGHT_SPEED;
constexpr double CQORV_DAY = 86400.0;

/// The range a header value must lie in, its unit and what the value is.
struct CValueRange {
    double mLow;
    double mHigh;
    const char* mUnit;
    const char* mWhat;
    const char* mNote = "";  // after the range: an exception the chain gives a meaning, or why
};

/// A field whose every element must lie in a fixed range.
struct CFieldRange {
    const char* mKey;
    CValueRange mRange;
};

// The ranges of spaceborne SAR: P band to Ka band, low Earth orbits of 200 .. 2000 km altitude.
constexpr CFieldRange CQORV_FIXED_RANGES[] = {
    {"ChannelInfo.CarrierFrequency", {0.2e9, 40e9, "Hz", "the carrier of a spaceborne SAR"}},
    {"ChannelInfo.SamplingRate", {1e6, 1e9, "Hz", "the range sampling rate of a spaceborne SAR"}},
    {"ChannelInfo.PRF", {100.0, 20000.0, "Hz", "the pulse repetition frequency of a spaceborne SAR"}},
    {"ChannelInfo.IncidenceAngle", {5.0, 75.0, "deg", "the incidence angle of a spaceborne SAR"}},
    {"ChannelInfo.RangeLookAngle", {3.0, 70.0, "deg", "the look angle of a spaceborne SAR"}},
    {"Processing.SlantRange", {200e3, 3000e3, "m", "the slant range of a spaceborne SAR"}},
    {"Processing.FastTime",
     {2.0 * 200e3 / CQORV_C, 2.0 * 3000e3 / CQORV_C, "s", "the two-way delay of an echo from 200 .. 3000 km"}},
    {"InitialGeometry.ReferenceHeight", {-500.0, 9000.0, "m", "the mean height of a scene on the Earth"}},
    {"RegistrationCoordinates.LatNorthing", {-90.0, 90.0, "deg", "a latitude"}},
    {"RegistrationCoordinates.LonEasting", {-180.0, 360.0, "deg", "a longitude"}},
};
constexpr CValueRange CQORV_PRF_EXTRACTED{100.0, 20000.0, "Hz", "the pulse repetition frequency of a spaceborne SAR"};
constexpr CValueRange CQORV_EFFECTIVE_VELOCITY{5000.0, 8500.0, "m/s", "the effective velocity of an orbiting platform",
                                               " (or 0: estimated by the chain)"};
constexpr CValueRange CQORV_ORBIT_RADIUS{6500e3, 8500e3, "m", "the orbital radius of a platform in a low Earth orbit"};
constexpr CValueRange CQORV_EARTH_FIXED_SPEED{6000.0, 8500.0, "m/s", "the Earth-fixed speed of an orbiting platform"};
constexpr CValueRange CQORV_INERTIAL_SPEED{6500.0, 8500.0, "m/s", "the inertial speed of an orbiting platform"};
constexpr CValueRange CQORV_TIME_DELTA{0.0, 1200.0, "s", "the time between two state vectors",
                                       " and above 0 (the times increase; at most a quarter of the shortest orbit)"};

constexpr double CQORV_FAST_TIME_TOLERANCE = 1e-3;  // relative, of 2 SlantRange[0] / c
constexpr double CQORV_SPACING_TOLERANCE = 0.01;    // relative, of c / (2 fs)
constexpr double CQORV_DURATION_TOLERANCE = 0.10;   // relative, of (lines - 1) / PRF
constexpr double CQORV_STEP_TOLERANCE = 0.25;       // relative, of the distance the speeds cover
constexpr double CQORV_MAX_DOPPLER_PRFS = 10.0;     // |centroid| at mid swath, in PRFs
constexpr int CQORV_MIN_STATE_VECTORS = 5;          // the orbit fit is of degree 4

// ------------------------------------------------------------------------------------------------
// Words of a refusal

std::string number(double theValue)
{
    return std::isnan(theValue) ? std::string("NaN") : fqorvStringFormat("%.6g", theValue);
}

[[noreturn]] void refuse(const std::string& theWords)
{
    fdfTrace("\nImpossible value in the raw header: %s\n", theWords.c_str());
    QORV_FATAL(CQORV_ERR_IMPOSSIBLE_VALUE, theWords.c_str());
}

/// "Key" for the value of a scalar or of a one-element vector, "Key[i]" for one of several.
std::string elementName(const char* theKey, int theIndex, int theCount)
{
    return theCount > 1 ? fqorvStringFormat("%s[%d]", theKey, theIndex) : std::string(theKey);
}

[[noreturn]] void refuseRange(const std::string& theName, const std::string& theValue, const CValueRange& theRange)
{
    refuse(theName + " = " + theValue + ": " + theRange.mWhat + " lies in " + number(theRange.mLow) + " .. " +
           number(theRange.mHigh) + " " + theRange.mUnit + theRange.mNote);
}

void requireInRange(const std::string& theName, double theValue, const CValueRange& theRange)
{
    if (!(theValue >= theRange.mLow && theValue <= theRange.mHigh))
        refuseRange(theName, number(theValue) + " " + theRange.mUnit, theRange);
}

// ------------------------------------------------------------------------------------------------
// Reading values: fields that hold none are left to the steps

/// The elements of a numeric scalar or vector field that hold a value, and the field's size.
struct CValues {
    int mCount = 0;
    std::vector<std::pair<int, double>> mSet;  // index, value
};

CValues values(const CDescriptionHeader& theHeader, const char* theKey)
{
    CValues aValues;
    const CDescriptionField* f = theHeader.findField(theKey);
    if (f == nullptr || !f->isInitialised()) return aValues;
    const bool aDouble = f->mDataType == CQORV_DT_DOUBLE;
    if (!aDouble && f->mDataType != CQORV_DT_INTEGER) return aValues;
    if (f->mStructure == CQORV_DS_SCALAR) {
        aValues.mCount = 1;
        aValues.mSet.emplace_back(0, aDouble ? f->getDouble() : f->getInteger());
    } else if (f->mStructure == CQORV_DS_VECTOR) {
        aValues.mCount = f->getNbrOfElements();
        for (int i = 0; i < aValues.mCount; ++i)
            if (f->isSet(0, i)) aValues.mSet.emplace_back(i, aDouble ? f->getDouble(i) : f->getInteger(i));
    }
    return aValues;
}

/// Element i of a field, else element 0, else theDefault.
double valueAt(const CValues& theValues, int theIndex, double theDefault)
{
    for (const auto& [aIndex, aValue] : theValues.mSet)
        if (aIndex == theIndex) return aValue;
    return theValues.mSet.empty() ? theDefault : theValues.mSet.front().second;
}

double firstValue(const CDescriptionHeader& theHeader, const char* theKey, double theDefault)
{
    return valueAt(values(theHeader, theKey), 0, theDefault);
}

/// The PRF the chain works with: the extraction copies "PRFExtracted"[0] into "PRF"[0] for every
/// sensor but ENVISAT-1. 0 when the header gives none.
double chainPrf(const CDescriptionHeader& theHeader, int theSensor)
{
    const double aPrf = firstValue(theHeader, "ChannelInfo.PRF", 0.0);
    return theSensor == CSAR_SENSOR_ENVISAT1_ID ? aPrf : firstValue(theHeader, "ChannelInfo.PRFExtracted", aPrf);
}

double absoluteSeconds(const CQorvDate& theDate)
{
    return static_cast<double>(theDate.dayNumber()) * CQORV_DAY + theDate.secondsOfDay();
}

std::string dateText(double theSeconds)
{
    const double aDay = std::floor(theSeconds / CQORV_DAY);
    CQorvDate aDate;
    aDate.set(static_cast<long>(aDay), theSeconds - aDay * CQORV_DAY);
    return aDate.text();
}

/// Parses a date field that holds a value; false when it holds none. A text that is no date of
/// the headers is refused.
bool parseDate(const CDescriptionHeader& theHeader, const char* theKey, CQorvDate& theDate)
{
    if (!fqorvHasValue(theHeader, theKey)) return false;
    const char* aText = theHeader[theKey].getString();
    if (!theDate.parse(aText))
        refuse(fqorvStringFormat("%s = \"%s\": a date of the headers reads DD-MMM-YYYY hh:mm:ss.uuuuuu, "
                                 "UTC, in the years 1970 .. 2100", theKey, aText));
    return true;
}

// ------------------------------------------------------------------------------------------------
// The stages of the check

/// A sensor name outside the sensor table is refused, with the nearest name on a near miss.
int checkSensorName(const CDescriptionHeader& theHeader)
{
    if (!fqorvHasValue(theHeader, "Sensor.SensorName")) return CSAR_SENSOR_UNKNOWN_ID;
    const std::string aName = theHeader["Sensor.SensorName"].getString();
    const int aSensor = fqorvSensorStrToID(aName.c_str());
    if (aSensor != CSAR_SENSOR_UNKNOWN_ID) return aSensor;
    const std::string aNearest = fdfNearestSensorName(aName);
    if (!aNearest.empty())
        refuse("Sensor.SensorName = \"" + aName + "\": not a known sensor; did you mean \"" + aNearest + "\"?");
    std::string aKnown;
    const char* aText = nullptr;
    int aId = 0;
    for (int aRow = 0; fqorvSensorRow(aRow, aText, aId); ++aRow) aKnown += (aRow > 0 ? ", " : "") + std::string(aText);
    refuse("Sensor.SensorName = \"" + aName + "\": not a known sensor; the known names are " + aKnown);
}

/// Every element of the fields of fixed range, and "PRFExtracted" where the chain uses it.
void checkFixedRanges(const CDescriptionHeader& theHeader, int theSensor)
{
    for (const CFieldRange& aField : CQORV_FIXED_RANGES) {
        const CValues aValues = values(theHeader, aField.mKey);
        for (const auto& [i, v] : aValues.mSet) requireInRange(elementName(aField.mKey, i, aValues.mCount), v, aField.mRange);
    }
    if (theSensor == CSAR_SENSOR_ENVISAT1_ID) return;
    const CValues aExtracted = values(theHeader, "ChannelInfo.PRFExtracted");
    for (const auto& [i, v] : aExtracted.mSet)
        requireInRange(elementName("ChannelInfo.PRFExtracted", i, aExtracted.mCount), v, CQORV_PRF_EXTRACTED);
}

/// The chirp of each channel: 0 < bandwidth <= sampling rate, 0 < pulse < echo window.
void checkChirp(const CDescriptionHeader& theHeader)
{
    const CValues aRates = values(theHeader, "ChannelInfo.SamplingRate");
    const CValues aBandwidths = values(theHeader, "ChannelInfo.BandWidth");
    for (const auto& [i, b] : aBandwidths.mSet) {
        const double fs = valueAt(aRates, i, INFINITY);
        if (!(b > 0.0 && b <= fs))
            refuse(fqorvStringFormat("%s = %s Hz: the chirp's bandwidth lies above 0 and at most the sampling rate, %s Hz",
                                     elementName("ChannelInfo.BandWidth", i, aBandwidths.mCount).c_str(),
                                     number(b).c_str(), number(fs).c_str()));
    }
    const CValues aPulses = values(theHeader, "ChannelInfo.PulseDuration");
    const double aPixels = firstValue(theHeader, "RasterInfo.NrOfPixelsPerLine", 0.0);
    for (const auto& [i, tau] : aPulses.mSet) {
        const double fs = valueAt(aRates, i, 0.0);
        const double aWindow = aPixels > 0.0 && fs > 0.0 ? aPixels / fs : INFINITY;
        if (!(tau > 0.0 && tau < aWindow))
            refuse(fqorvStringFormat("%s = %s s: the pulse lies above 0 and below the echo window, "
                                     "NrOfPixelsPerLine / SamplingRate = %s / %s Hz = %s s",
                                     elementName("ChannelInfo.PulseDuration", i, aPulses.mCount).c_str(),
                                     number(tau).c_str(), number(aPixels).c_str(), number(fs).c_str(),
                                     number(aWindow).c_str()));
    }
}

/// The first delay agrees with the near range, the range spacing with the sampling rate.
void checkRangeGeometry(const CDescriptionHeader& theHeader)
{
    const double aNear = firstValue(theHeader, "Processing.SlantRange", NAN);
    const double aDelay = firstValue(theHeader, "Processing.FastTime", NAN);
    if (!std::isnan(aNear) && !std::isnan(aDelay)) {
        const double aExpected = 2.0 * aNear / CQORV_C;
        if (!(std::abs(aDelay - aExpected) <= CQORV_FAST_TIME_TOLERANCE * aExpected))
            refuse(fqorvStringFormat("Processing.FastTime[0] = %s s: the delay of the first sample lies within "
                                     "%s %% of 2 Processing.SlantRange[0] / c = %s s",
                                     number(aDelay).c_str(), number(100.0 * CQORV_FAST_TIME_TOLERANCE).c_str(),
                                     number(aExpected).c_str()));
    }
    const double aSpacing = firstValue(theHeader, "Processing.PixelSpacingRg", NAN);
    const double fs = firstValue(theHeader, "ChannelInfo.SamplingRate", NAN);
    if (!std::isnan(aSpacing) && !std::isnan(fs)) {
        const double aExpected = CQORV_C / (2.0 * fs);
        if (!(std::abs(aSpacing - aExpected) <= CQORV_SPACING_TOLERANCE * aExpected))
            refuse(fqorvStringFormat("Processing.PixelSpacingRg = %s m: the slant range spacing lies within %s %% of "
                                     "c / (2 ChannelInfo.SamplingRate) = %s m",
                                     number(aSpacing).c_str(), number(100.0 * CQORV_SPACING_TOLERANCE).c_str(),
                                     number(aExpected).c_str()));
    }
}

/// A processing velocity of 0 leaves the velocity to the chain's estimation; any other value is
/// that of an orbiting platform.
void checkProcessingVelocity(const CDescriptionHeader& theHeader)
{
    const CValues aVelocities = values(theHeader, "Processing.ProcessingVelocity");
    for (const auto& [i, v] : aVelocities.mSet)
        if (v != 0.0)
            requireInRange(elementName("Processing.ProcessingVelocity", i, aVelocities.mCount), v,
                           CQORV_EFFECTIVE_VELOCITY);
}

/// The scene's first and last line in seconds since 1970; mKnown false without a start time.
struct CSceneTimes {
    bool mKnown = false;
    double mStart = 0.0;
    double mStop = 0.0;
};

/// Start and stop parse, and their distance fits the lines and the PRF.
CSceneTimes checkSceneTimes(const CDescriptionHeader& theHeader, double thePrf)
{
    CSceneTimes aTimes;
    CQorvDate aStart, aStop;
    const bool aHasStart = parseDate(theHeader, "AcquisitionParameters.AzimuthStartTime", aStart);
    const bool aHasStop = parseDate(theHeader, "AcquisitionParameters.AzimuthStopTime", aStop);
    if (!aHasStart) return aTimes;
    const int aLines = static_cast<int>(firstValue(theHeader, "RasterInfo.NrOfLinesPerImage", 0.0));
    aTimes.mKnown = true;
    aTimes.mStart = absoluteSeconds(aStart);
    aTimes.mStop = aTimes.mStart + (aLines > 0 && thePrf > 0.0 ? aLines / thePrf : 0.0);
    if (!aHasStop) return aTimes;
    aTimes.mStop = absoluteSeconds(aStop);
    if (aLines < 1 || !(thePrf > 0.0)) return aTimes;
    const double aExpected = (aLines - 1) / thePrf;
    const double aDuration = aTimes.mStop - aTimes.mStart;
    if (!(std::abs(aDuration - aExpected) <= std::max(CQORV_DURATION_TOLERANCE * aExpected, 1.0 / thePrf)))
        refuse(fqorvStringFormat("AcquisitionParameters.AzimuthStopTime = %s: %s s after the start, while %d lines "
                                 "at a PRF of %s Hz last %s s; the two agree within %s %% (lost and filled lines "
                                 "make a few percent)",
                                 theHeader["AcquisitionParameters.AzimuthStopTime"].getString(),
                                 number(aDuration).c_str(), aLines, number(thePrf).c_str(), number(aExpected).c_str(),
                                 number(100.0 * CQORV_DURATION_TOLERANCE).c_str()));
    return aTimes;
}

/// One state vector: position (m) and velocity (m/s).
struct CStateVector {
    int mIndex;
    double mPos[3];
    double mVel[3];
};

double norm(const double* v)
{
    return std::sqrt(v[0] * v[0] + v[1] * v[1] + v[2] * v[2]);
}

/// The state vectors 0 .. n-1 whose six values are all given.
std::vector<CStateVector> stateVectors(const CDescriptionHeader& theHeader, int n)
{
    static const char* const CAXES[6] = {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z",
                                         "StateVectorData.vel_x", "StateVectorData.vel_y", "StateVectorData.vel_z"};
    std::vector<std::vector<double>> aAxes(6, std::vector<double>(static_cast<std::size_t>(std::max(n, 0)), NAN));
    std::vector<int> aGiven(static_cast<std::size_t>(std::max(n, 0)), 0);
    for (int a = 0; a < 6; ++a)
        for (const auto& [k, v] : values(theHeader, CAXES[a]).mSet)
            if (k < n) {
                aAxes[static_cast<std::size_t>(a)][static_cast<std::size_t>(k)] = v;
                ++aGiven[static_cast<std::size_t>(k)];
            }
    std::vector<CStateVector> aVectors;
    for (int k = 0; k < n; ++k) {
        if (aGiven[static_cast<std::size_t>(k)] < 6) continue;
        const auto at = [&](int a) { return aAxes[static_cast<std::size_t>(a)][static_cast<std::size_t>(k)]; };
        aVectors.push_back({k, {at(0), at(1), at(2)}, {at(3), at(4), at(5)}});
    }
    return aVectors;
}

/// Seconds of each state vector after the first: "TimeDeltaStepsFromFirst" when given (as the
/// orbit code takes them), else multiples of "TimeDelta". Empty when the header gives neither.
std::vector<double> stateVectorTimes(const CDescriptionHeader& theHeader, int n)
{
    std::vector<double> aTimes;
    const CValues aSteps = values(theHeader, "StateVectorData.TimeDeltaStepsFromFirst");
    if (!aSteps.mSet.empty()) {
        const double aFirst = aSteps.mSet.front().second;
        for (const auto& [i, v] : aSteps.mSet) {
            if (i >= n) break;
            const double t = v - aFirst;
            if (!aTimes.empty() && !(t > aTimes.back()))
                refuse(fqorvStringFormat("StateVectorData.TimeDeltaStepsFromFirst[%d] = %s s: the times of the "
                                         "state vectors increase strictly",
                                         i, number(v).c_str()));
            aTimes.push_back(t);
        }
        return aTimes;
    }
    if (!fqorvHasValue(theHeader, "StateVectorData.TimeDelta")) return aTimes;
    const double aDelta = theHeader["StateVectorData.TimeDelta"].getDouble();
    if (!(aDelta > 0.0 && aDelta <= CQORV_TIME_DELTA.mHigh))
        refuseRange("StateVectorData.TimeDelta", number(aDelta) + " s", CQORV_TIME_DELTA);
    for (int k = 0; k < n; ++k) aTimes.push_back(k * aDelta);
    return aTimes;
}

/// Each vector at an orbital radius and speed; consecutive vectors as far apart as their speeds
/// carry the platform in the time between them.
void checkOrbitalStates(const std::vector<CStateVector>& theVectors, const std::vector<double>& theTimes,
                        bool theInertial)
{
    for (const CStateVector& s : theVectors) {
        const std::string aPos = fqorvStringFormat("(%s, %s, %s) m", number(s.mPos[0]).c_str(),
                                                   number(s.mPos[1]).c_str(), number(s.mPos[2]).c_str());
        const std::string aVel = fqorvStringFormat("(%s, %s, %s) m/s", number(s.mVel[0]).c_str(),
                                                   number(s.mVel[1]).c_str(), number(s.mVel[2]).c_str());
        const double r = norm(s.mPos), v = norm(s.mVel);
        if (!(r >= CQORV_ORBIT_RADIUS.mLow && r <= CQORV_ORBIT_RADIUS.mHigh))
            refuseRange(fqorvStringFormat("StateVectorData.pos_x/y/z[%d]", s.mIndex), aPos + ", a radius of " + number(r) + " m",
                        CQORV_ORBIT_RADIUS);
        const CValueRange& aSpeed = theInertial ? CQORV_INERTIAL_SPEED : CQORV_EARTH_FIXED_SPEED;
        if (!(v >= aSpeed.mLow && v <= aSpeed.mHigh))
            refuseRange(fqorvStringFormat("StateVectorData.vel_x/y/z[%d]", s.mIndex), aVel + ", a speed of " + number(v) + " m/s",
                        aSpeed);
    }
    for (std::size_t k = 1; k < theVectors.size(); ++k) {
        const CStateVector &a = theVectors[k - 1], &b = theVectors[k];
        if (b.mIndex >= static_cast<int>(theTimes.size())) break;
        const double aTime = theTimes[static_cast<std::size_t>(b.mIndex)] - theTimes[static_cast<std::size_t>(a.mIndex)];
        const double aStep[3] = {b.mPos[0] - a.mPos[0], b.mPos[1] - a.mPos[1], b.mPos[2] - a.mPos[2]};
        const double aApart = norm(aStep);
        const double aCovered = 0.5 * (norm(a.mVel) + norm(b.mVel)) * aTime;
        if (!(std::abs(aApart - aCovered) <= CQORV_STEP_TOLERANCE * aCovered))
            refuse(fqorvStringFormat("StateVectorData.TimeDelta: state vectors %d and %d lie %s m apart, while their "
                                     "speeds carry the platform %s m in the %s s between them; the two agree within "
                                     "%s %% on an orbit",
                                     a.mIndex, b.mIndex, number(aApart).c_str(), number(aCovered).c_str(),
                                     number(aTime).c_str(), number(100.0 * CQORV_STEP_TOLERANCE).c_str()));
    }
}

/// The vectors span the scene, or come within one step of its ends: the orbit fit extrapolates
/// that far and no further.
void checkOrbitSpan(const CDescriptionHeader& theHeader, const std::vector<double>& theTimes, const CSceneTimes& theScene)
{
    CQorvDate aFirstDate;
    if (!parseDate(theHeader, "StateVectorData.TimeFirst", aFirstDate) || !theScene.mKnown || theTimes.size() < 2) return;
    const double aFirst = absoluteSeconds(aFirstDate);
    const double aLast = aFirst + theTimes.back();
    const double aMargin = theTimes.back() / static_cast<double>(theTimes.size() - 1);
    if (aFirst <= theScene.mStart + aMargin && aLast >= theScene.mStop - aMargin) return;
    refuse(fqorvStringFormat("StateVectorData.TimeFirst = %s: the %d state vectors span %s .. %s; they cover the "
                             "scene, %s .. %s, to within one step (%s s)",
                             theHeader["StateVectorData.TimeFirst"].getString(), static_cast<int>(theTimes.size()),
                             dateText(aFirst).c_str(), dateText(aLast).c_str(), dateText(theScene.mStart).c_str(),
                             dateText(theScene.mStop).c_str(), number(aMargin).c_str()));
}

/// Enough state vectors for the orbit fit (or none, with the scene centre given), at orbital
/// radii and speeds, their times increasing and spanning the scene.
void checkStateVectors(const CDescriptionHeader& theHeader, const CSceneTimes& theScene)
{
    if (!fqorvHasValue(theHeader, "StateVectorData.nStateVectors")) return;
    const int n = theHeader["StateVectorData.nStateVectors"].getInteger();
    const bool aCentre = fqorvHasValue(theHeader, "RegistrationCoordinates.LatNorthing") &&
                         fqorvHasValue(theHeader, "RegistrationCoordinates.LonEasting");
    if (n == 0 && aCentre) return;
    if (n < CQORV_MIN_STATE_VECTORS)
        refuse(fqorvStringFormat("StateVectorData.nStateVectors = %d: the orbit fit needs at least %d state vectors%s",
                                 n, CQORV_MIN_STATE_VECTORS,
                                 n == 0 ? " (0 only with RegistrationCoordinates.LatNorthing and LonEasting given)"
                                        : ""));
    const std::vector<double> aTimes = stateVectorTimes(theHeader, n);
    const bool aInertial = fqorvHasValue(theHeader, "StateVectorData.StateVectorReference") &&
                           std::strncmp(theHeader["StateVectorData.StateVectorReference"].getString(), "IRS", 3) == 0;
    checkOrbitalStates(stateVectors(theHeader, n), aTimes, aInertial);
    checkOrbitSpan(theHeader, aTimes, theScene);
}

/// A Doppler table's coefficients are finite and its centroid at mid swath lies within a few
/// PRFs of 0; the centroid comes from the geometry code's own reading of the table.
void checkDopplerTable(const CDescriptionHeader& theHeader, double thePrf)
{
    const CDescriptionField* f = theHeader.findField("Processing.DopCenRangeCoeff");
    if (f == nullptr || !f->isInitialised() || f->mDataType != CQORV_DT_DOUBLE) return;
    for (int r = 0; r < f->getNbrOfRows(); ++r)
        for (int c = 0; c < f->getNbrOfElements(); ++c)
            if (f->isSet(r, c) && !std::isfinite(f->getDouble(r, c)))
                refuse(fqorvStringFormat("Processing.DopCenRangeCoeff[%d][%d] = %s: the coefficients of a Doppler "
                                         "table are finite",
                                         r, c, number(f->getDouble(r, c)).c_str()));
    // The geometry code reads these without a default: without them the steps report what is missing.
    for (const char* aKey : {"Sensor.SensorName", "ChannelInfo.Description", "ChannelInfo.CarrierFrequency",
                             "ChannelInfo.PRF", "RasterInfo.NrOfPixelsPerLine", "RasterInfo.NrOfLinesPerImage",
                             "StateVectorData.TimeFirst", "AcquisitionParameters.AzimuthStartTime",
                             "Processing.SlantRange", "Processing.PixelSpacingRg"})
        if (!fqorvHasValue(theHeader, aKey)) return;
    if (!(thePrf > 0.0)) return;
    YDF_SAR aSar;
    read_image_info(theHeader, aSar);
    const double aCentroid = aSar.getDopplerFromPixel(0.5 * aSar.ncol, 0.5 * aSar.nrow, false, false);
    const double aLimit = CQORV_MAX_DOPPLER_PRFS * thePrf;
    if (!(std::abs(aCentroid) <= aLimit))
        refuse(fqorvStringFormat("Processing.DopCenRangeCoeff: a Doppler centroid of %s Hz at mid swath; it lies "
                                 "within +-%s PRF = +-%s Hz",
                                 number(aCentroid).c_str(), number(CQORV_MAX_DOPPLER_PRFS).c_str(),
                                 number(aLimit).c_str()));
}

// ------------------------------------------------------------------------------------------------
// Near misses of a sensor name

std::string upperCase(const std::string& theText)
{
    std::string aUpper = theText;
    for (char& ch : aUpper) ch = static_cast<char>(std::toupper(static_cast<unsigned char>(ch)));
    return aUpper;
}

/// The letters and digits of a name in upper case: "alos-palsar" and "ALOS_PALSAR" read the same.
std::string lettersOf(const std::string& theText)
{
    std::string aLetters;
    for (char ch : upperCase(theText))
        if (std::isalnum(static_cast<unsigned char>(ch)) || ch == '+') aLetters += ch;
    return aLetters;
}

/// Insertions, deletions and replacements that turn one text into the other.
int editDistance(const std::string& a, const std::string& b)
{
    std::vector<int> aRow(b.size() + 1);
    for (std::size_t j = 0; j <= b.size(); ++j) aRow[j] = static_cast<int>(j);
    for (std::size_t i = 1; i <= a.size(); ++i) {
        int aDiagonal = aRow[0];
        aRow[0] = static_cast<int>(i);
        for (std::size_t j = 1; j <= b.size(); ++j) {
            const int aAbove = aRow[j];
            aRow[j] = std::min({aRow[j] + 1, aRow[j - 1] + 1, aDiagonal + (a[i - 1] == b[j - 1] ? 0 : 1)});
            aDiagonal = aAbove;
        }
    }
    return aRow[b.size()];
}

}  // namespace

// ------------------------------------------------------------------------------------------------

std::string fdfNearestSensorName(const std::string& theName)
{
    const char* aText = nullptr;
    int aId = 0;
    const std::string aLetters = lettersOf(theName);
    for (int aRow = 0; fqorvSensorRow(aRow, aText, aId); ++aRow)
        if (!aLetters.empty() && lettersOf(aText) == aLetters) return aText;
    std::string aNearest;
    int aBest = 4;
    for (int aRow = 0; fqorvSensorRow(aRow, aText, aId); ++aRow) {
        const int d = editDistance(upperCase(theName), aText);
        if (d < aBest) {
            aBest = d;
            aNearest = aText;
        }
    }
    return aBest < static_cast<int>(theName.size()) ? aNearest : std::string();
}

bool fdfStepsReadRawEchoes(const std::vector<int>& theSteps)
{
    return std::any_of(theSteps.begin(), theSteps.end(), [](int s) { return s == 1 || s == 2; });
}

void fdfCheckRawHeader(const CDescriptionHeader& theHeader)
{
    const int aSensor = checkSensorName(theHeader);
    checkFixedRanges(theHeader, aSensor);
    checkChirp(theHeader);
    checkRangeGeometry(theHeader);
    checkProcessingVelocity(theHeader);
    const double aPrf = chainPrf(theHeader, aSensor);
    const CSceneTimes aScene = checkSceneTimes(theHeader, aPrf);
    checkStateVectors(theHeader, aScene);
    checkDopplerTable(theHeader, aPrf);
}

void fdfCheckRawHeaderOf(const std::string& theInput)
{
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    if (!aHeader->read((theInput + "_hdr").c_str(), false)) return;
    fdfTrace("\nChecking the values of the raw header of %s\n", theInput.c_str());
    fdfCheckRawHeader(*aHeader);
}
