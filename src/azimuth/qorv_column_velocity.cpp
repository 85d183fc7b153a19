// The effective velocity of every range column from the orbit.
#include "qorv_column_velocity.h"

#include <cmath>
#include <cstring>

#include "qorv_date.h"
#include "qorv_description_section.h"

namespace {

// Columns between two exact evaluations; the velocity is linear in range to far below a mm/s there.
constexpr int CQORV_VELOCITY_NODE = 64;

bool fText(const CDescriptionHeader& theData, const char* theKey, const char*& theText)
{
    if (!fqorvHasValue(theData, theKey)) return false;
    theText = theData[theKey].getString();
    return theText != nullptr && *theText != '\0';
}

/// Seconds from the first state vector to the date of field theKey; false when a date is missing or
/// does not parse.
bool fSecondsAfterFirstVector(const CDescriptionHeader& theData, const char* theKey, double& theSeconds)
{
    const char* aFirstText = nullptr;
    const char* aText = nullptr;
    CQorvDate aFirst, aDate;
    if (!fText(theData, "StateVectorData.TimeFirst", aFirstText) || !fText(theData, theKey, aText) ||
        !aFirst.parse(aFirstText) || !aDate.parse(aText))
        return false;
    theSeconds = (aDate.dayNumber() - aFirst.dayNumber()) * 86400.0 + aDate.secondsOfDay() - aFirst.secondsOfDay();
    return true;
}

/// The header's state vectors, timed from the first one ("TimeDeltaStepsFromFirst", else multiples
/// of "TimeDelta"). Empty when they are too few or their times do not increase.
std::vector<CStateVector> fStateVectors(const CDescriptionHeader& theData)
{
    std::vector<CStateVector> aVectors;
    const int n = fqorvHasValue(theData, "StateVectorData.nStateVectors") ? theData["StateVectorData.nStateVectors"].getInteger() : 0;
    if (n < 4 || !fqorvHasValue(theData, "StateVectorData.pos_x") || !fqorvHasValue(theData, "StateVectorData.vel_x"))
        return aVectors;
    const bool aSteps = fqorvHasValue(theData, "StateVectorData.TimeDeltaStepsFromFirst") &&
                        theData["StateVectorData.TimeDeltaStepsFromFirst"].getNbrOfElements() >= n;
    const double aDelta = fqorvHasValue(theData, "StateVectorData.TimeDelta") ? theData["StateVectorData.TimeDelta"].getDouble() : 0.0;
    static const char* const CAXES[6] = {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z",
                                         "StateVectorData.vel_x", "StateVectorData.vel_y", "StateVectorData.vel_z"};
    for (const char* aKey : CAXES)
        if (!fqorvHasValue(theData, aKey) || theData[aKey].getNbrOfElements() < n) return aVectors;
    for (int i = 0; i < n; ++i) {
        CStateVector v;
        v.mTime = aSteps ? theData["StateVectorData.TimeDeltaStepsFromFirst"].getDouble(i) -
                               theData["StateVectorData.TimeDeltaStepsFromFirst"].getDouble(0)
                         : i * aDelta;
        for (int a = 0; a < 3; ++a) {
            v.mPosition[a] = theData[CAXES[a]].getDouble(i);
            v.mVelocity[a] = theData[CAXES[3 + a]].getDouble(i);
        }
        if (!aVectors.empty() && !(v.mTime > aVectors.back().mTime)) return {};
        aVectors.push_back(v);
    }
    return aVectors;
}

double fHeaderDouble(const CDescriptionHeader& theData, const char* theKey, int theIndex, double theDefault)
{
    if (!fqorvHasValue(theData, theKey) || theData[theKey].getNbrOfElements() <= theIndex) return theDefault;
    return theData[theKey].getDouble(theIndex);
}

}  // namespace

std::optional<CColumnVelocityModel> CColumnVelocityModel::fromHeader(const CDescriptionHeader& theData,
                                                                     double theProcessingVelocity, std::string& theReason)
{
    if (fqorvHasValue(theData, "StateVectorData.StateVectorReference") &&
        std::strncmp(theData["StateVectorData.StateVectorReference"].getString(), "IRS", 3) == 0) {
        theReason = "the state vectors are inertial";
        return std::nullopt;
    }
    std::vector<CStateVector> aVectors = fStateVectors(theData);
    if (aVectors.empty()) {
        theReason = "the header holds fewer than 4 state vectors with increasing times";
        return std::nullopt;
    }
    CColumnVelocityModel m{CStateVectorOrbit(std::move(aVectors))};
    m.mPrf = fHeaderDouble(theData, "ChannelInfo.PRF", 0, 0.0);
    const int aLines = fqorvHasValue(theData, "RasterInfo.NrOfLinesPerImage")
                           ? theData["RasterInfo.NrOfLinesPerImage"].getInteger() : 0;
    if (!fSecondsAfterFirstVector(theData, "AcquisitionParameters.AzimuthStartTime", m.mStartTime) || !(m.mPrf > 0.0)) {
        theReason = "the scene start or the state vectors' first time is missing";
        return std::nullopt;
    }
    // The vectors must cover the scene, with at most one vector spacing beyond either end.
    const CStateVectorOrbit& o = m.mOrbit;
    const double aSpacing = (o.lastTime() - o.firstTime()) / (o.vectors().size() - 1);
    if (m.lineTime(0) < o.firstTime() - aSpacing || m.lineTime(aLines) > o.lastTime() + aSpacing) {
        theReason = "the state vectors do not span the scene";
        return std::nullopt;
    }
    m.mHeight = fHeaderDouble(theData, "InitialGeometry.ReferenceHeight", 0, 0.0);
    if (!std::isfinite(m.mHeight)) m.mHeight = 0.0;
    const double aCentreRange = fHeaderDouble(theData, "Processing.SlantRange", 1, 0.0);
    const double aMiddle = m.lineTime(0.5 * aLines);

    // The side of the track: the one whose centre point lies nearer the header's scene centre
    // (right of the track without one).
    const double aLat = fHeaderDouble(theData, "RegistrationCoordinates.LatNorthing", 0, NAN);
    const double aLon = fHeaderDouble(theData, "RegistrationCoordinates.LonEasting", 0, NAN);
    if (std::isfinite(aLat) && std::isfinite(aLon)) {
        double aBest = INFINITY;
        for (const int aSign : {1, -1}) {
            CZeroDopplerPoint p;
            if (!fqorvZeroDopplerPoint(o, aMiddle, aCentreRange, m.mHeight, aSign, p)) continue;
            const double aDistance = std::hypot(p.mLatitudeDeg - aLat, std::remainder(p.mLongitudeDeg - aLon, 360.0) *
                                                                           std::cos(aLat * M_PI / 180.0));
            if (aDistance < aBest) {
                aBest = aDistance;
                m.mLookSign = aSign;
            }
        }
    }
    const double aCentreVelocity = fqorvEffectiveVelocity(o, aMiddle, aCentreRange, m.mHeight, m.mLookSign);
    if (!(aCentreVelocity > 0.0) || !(theProcessingVelocity > 0.0)) {
        theReason = "the orbit reaches no target at the centre range";
        return std::nullopt;
    }
    m.mScale = theProcessingVelocity / aCentreVelocity;
    return m;
}

std::vector<double> CColumnVelocityModel::velocities(double theNearRange, double theSpacing, int theCount,
                                                     double theLine) const
{
    std::vector<double> aVelocities(theCount, 0.0);
    const double t = lineTime(theLine);
    double aAtStart = 0.0;
    for (int k0 = 0; k0 < theCount; k0 += CQORV_VELOCITY_NODE) {
        const int k1 = std::min(k0 + CQORV_VELOCITY_NODE, theCount - 1);
        if (k0 == 0) aAtStart = fqorvEffectiveVelocity(mOrbit, t, theNearRange, mHeight, mLookSign);
        const double aAtEnd = fqorvEffectiveVelocity(mOrbit, t, theNearRange + k1 * theSpacing, mHeight, mLookSign);
        if (!(aAtStart > 0.0) || !(aAtEnd > 0.0)) return {};
        const int aEnd = std::min(k0 + CQORV_VELOCITY_NODE, theCount);
        for (int k = k0; k < aEnd; ++k)
            aVelocities[k] = mScale * (k1 > k0 ? aAtStart + (aAtEnd - aAtStart) * (k - k0) / (k1 - k0) : aAtStart);
        aAtStart = aAtEnd;
    }
    return aVelocities;
}
