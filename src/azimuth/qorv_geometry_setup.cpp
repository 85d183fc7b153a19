// The spaceborne geometry set-up of the azimuth steps.
#include "qorv_geometry_setup.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"

namespace {

constexpr double CSAR_C = 299792458.0;
constexpr double CSAR_EARTH_A = 6378144.0;  // semi-major axis, m
constexpr double CSAR_EARTH_B = 6356755.0;  // semi-minor axis, m
const double aTwoPi = 2.0 * M_PI;
const double aDegToRad = M_PI / 180.0;
const double aRadToDeg = 180.0 / M_PI;

/// The orbit block: spacing on the ground from the velocity and position at the middle state vector.
void fOrbitSpacing(CSpaceborneGeometry& g)
{
    const CGeometryInput& in = g.mIn;
    const double e2 = (CSAR_EARTH_A * CSAR_EARTH_A - CSAR_EARTH_B * CSAR_EARTH_B) / (CSAR_EARTH_A * CSAR_EARTH_A);
    const double vs = std::sqrt(in.mVel[0] * in.mVel[0] + in.mVel[1] * in.mVel[1] + in.mVel[2] * in.mVel[2]);
    const double rs = std::sqrt(in.mPos[0] * in.mPos[0] + in.mPos[1] * in.mPos[1] + in.mPos[2] * in.mPos[2]);
    fdfTrace("along-track s/c velocity (m/s): %f\n", vs);
    fdfTrace("radial distance of s/c from earth center (m): %f\n", rs);
    const double lat = in.mLatitudeDeg * aDegToRad;
    const double lon = in.mLongitudeDeg * aDegToRad;
    const double n = CSAR_EARTH_A / std::sqrt(1.0 - e2 * std::sin(lat) * std::sin(lat));
    fdfTrace("radius of curvature of the earth in the prime vertical (east-west): %f\n", n);
    const double h = in.mReferenceHeight;
    const double x = (h + n) * std::cos(lat) * std::cos(lon);
    const double y = (h + n) * std::cos(lat) * std::sin(lon);
    const double z = ((1.0 - e2) * n + h) * std::sin(lat);
    fdfTrace("image center coordinates (x,y,z)(m): %f %f %f\n", x, y, z);
    const double re = std::sqrt(x * x + y * y + z * z);
    fdfTrace("geocentric radius of the earth at the reference altitude: %f\n", re);
    const double rc = in.mCentreRange;
    g.mCosb = (rs * rs + re * re - rc * rc) / (2.0 * re * rs);
    fdfTrace("angle between subradar point and center swath relative to earth center (deg.): %f\n",
             std::acos(g.mCosb) * aRadToDeg);
    g.mSpacingOrbit = (in.mPresumming * in.mDecimation * vs / in.mPrf) * (re / rs) * g.mCosb;
}

}  // namespace

void CGeometryVariant::dopplerPosition(int theWidth, int theRangeFftSize, int theOffset, int theFirSize,
                                       int theDecimation, int theAzimuthFftSize, int theLastLine, double& thePixel,
                                       double& theLine) const
{
    int aLine;
    if (mDoppler == EGeometryDopplerPosition::BlockCentre) {
        thePixel = theRangeFftSize / 2;
        aLine = theOffset + theAzimuthFftSize / 2;
    } else {
        thePixel = theWidth / 2;
        aLine = theOffset + theFirSize / 2 - theDecimation + theAzimuthFftSize;
    }
    theLine = std::min(aLine, theLastLine);
}

double CSpaceborneGeometry::fmRate(double theRange) const
{
    return -2.0 * mIn.mCarrierFrequency * mIn.mVelocity * mIn.mVelocity / (theRange * CSAR_C);
}

double CSpaceborneGeometry::fmRateSquinted(double theCentroid) const
{
    const double aCos = std::cos(std::acos(CSAR_C * theCentroid / (2.0 * mIn.mVelocity * mIn.mCarrierFrequency)));
    return -2.0 * mIn.mCarrierFrequency * mIn.mVelocity * mIn.mVelocity * (1.0 - aCos * aCos) /
           (mIn.mCentreRange * CSAR_C);
}

double CSpaceborneGeometry::apertureRange(double theFrequency) const
{
    const double u = CSAR_C * theFrequency / (2.0 * mIn.mCarrierFrequency * mIn.mVelocity);
    return mClosestRange / std::sqrt(1.0 - u * u);
}

int CSpaceborneGeometry::apertureLines(double theBandwidth, double theRate) const
{
    return 2 * static_cast<int>((-theBandwidth / theRate) * mIn.mPrf / (2.0 * mIn.mPresumming * mIn.mDecimation)) + 1;
}

CGeometryInput fqorvReadGeometryInput(const CDescriptionHeader& theData, const CDescriptionHeader& thePar,
                                      const CGeometryVariant& theVariant, int thePresumming, int theDecimation,
                                      const std::string& theHeaderName)
{
    CGeometryInput in;
    in.mCarrierFrequency = theData["ChannelInfo.CarrierFrequency"].getDouble(0);
    in.mSamplingRate = theData["ChannelInfo.SamplingRate"].getDouble(0);
    in.mPrf = theData["ChannelInfo.PRF"].getDouble(0);
    in.mStateVectorNbr = theData["StateVectorData.nStateVectors"].getInteger();
    if (in.mStateVectorNbr != 0) {
        for (const char* aName : {"vel", "pos"}) {
            const std::string aKey = std::string("StateVectorData.") + aName + "_x";
            if (!fqorvHasValue(theData, aKey.c_str())) {
                fdfTrace("Missing mandatory field %s in file %s\n", aName, theHeaderName.c_str());
                QORV_FATAL(theVariant.mMissingOrbitFailure, aName);
            }
        }
        const int k = in.mStateVectorNbr / 2;
        const char* aAxes[3] = {"x", "y", "z"};
        for (int a = 0; a < 3; ++a) {
            in.mPos[a] = theData[std::string("StateVectorData.pos_") + aAxes[a]].getDouble(k);
            in.mVel[a] = theData[std::string("StateVectorData.vel_") + aAxes[a]].getDouble(k);
        }
        in.mLatitudeDeg = theData["RegistrationCoordinates.LatNorthing"].getDouble();
        in.mLongitudeDeg = theData["RegistrationCoordinates.LonEasting"].getDouble();
        in.mReferenceHeight = theData["InitialGeometry.ReferenceHeight"].getDouble();
    }
    in.mNearRange = theData["Processing.SlantRange"].getDouble(0);
    in.mCentreRange = theData["Processing.SlantRange"].getDouble(1);
    in.mFarRange = theData["Processing.SlantRange"].getDouble(2);
    in.mVelocity = thePar["sar_processing.Velocity"].getDouble();
    if (theVariant.mUserVelocity && fqorvHasValue(theData, "Processing.UserProcessingVelocity"))
        in.mVelocity = theData["Processing.UserProcessingVelocity"].getDouble(0);
    if (in.mVelocity == 0.0 || std::isnan(in.mVelocity)) {
        fdfTrace("Error: processing velocity %f\n", in.mVelocity);
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "Velocity");
    }
    in.mBandFraction = thePar["sar_processing.AzBandWidthFraction"].getDouble();
    in.mPresumming = thePresumming;
    in.mDecimation = theVariant.mFixedDecimation > 0 ? theVariant.mFixedDecimation : theDecimation;
    return in;
}

CSpaceborneGeometry fqorvSpaceborneGeometry(const CGeometryInput& theIn, double theCentroid)
{
    CSpaceborneGeometry g;
    g.mIn = theIn;
    const CGeometryInput& in = g.mIn;
    const double aPsfNdec = static_cast<double>(in.mPresumming) * in.mDecimation;
    g.mSpacingNoOrbit = aPsfNdec * in.mVelocity / in.mPrf;
    if (g.hasOrbit()) {
        fdfTrace("\nSPACEBORNE SAR GEOMETRY:\n");
        fOrbitSpacing(g);
    }

    g.mRangeSpacing = CSAR_C / (2.0 * in.mSamplingRate);
    g.mWavelength = CSAR_C / in.mCarrierFrequency;
    fdfTrace("radar wavelength (m):                    %f\n", g.mWavelength);
    // The depth of focus is linear in the azimuth resolution without orbit, on purpose.
    const double aDepth = 8.0 * in.mCarrierFrequency * (g.mSpacingNoOrbit / in.mBandFraction) / CSAR_C;
    fdfTrace("az. depth of focus (range m, pixels):    %f %f\n", aDepth, aDepth / g.mRangeSpacing);

    g.mCentroid = theCentroid;
    fdfTrace("doppler centroid @swath center (Hz):     %f\n", theCentroid);
    g.mCentroidRad = aTwoPi * theCentroid / in.mPrf;
    fdfTrace("doppler centroid (radians/sample):       %f\n", g.mCentroidRad);
    g.mPhi = std::acos(theCentroid * CSAR_C / (2.0 * in.mVelocity * in.mCarrierFrequency));
    fdfTrace("angle between vel.+look vec.(deg.):      %f\n", g.mPhi * aRadToDeg);
    fdfTrace("doppler squint angle (degrees):          %f\n", 90.0 - g.mPhi * aRadToDeg);
    g.mFilterBandwidthRad = aTwoPi * in.mBandFraction / in.mDecimation;
    fdfTrace("az. aperture filt. bandwidth (rad.):     %f\n", g.mFilterBandwidthRad);
    g.mDopplerMin = theCentroid - in.mPrf / (2.0 * in.mPresumming);
    g.mDopplerMax = theCentroid + in.mPrf / (2.0 * in.mPresumming);
    fdfTrace("synth. aperture doppler min,max (Hz):    %f %f\n", g.mDopplerMin, g.mDopplerMax);
    const double aCosPhi = std::cos(g.mPhi);
    g.mClosestRange = std::sqrt(1.0 - aCosPhi * aCosPhi) * in.mFarRange;
    fdfTrace("range at closest approach @(far rg)(m):  %f\n", g.mClosestRange);
    const double aRMin = g.apertureRange(g.mDopplerMin);
    const double aRMax = g.apertureRange(g.mDopplerMax);
    fdfTrace("range across aperture @(far rg) (m):     %f %f %f\n", aRMin, g.apertureRange(theCentroid), aRMax);
    const bool aHoldsZero = g.mDopplerMin <= 0.0 && 0.0 <= g.mDopplerMax;
    g.mApertureRangeMin = aHoldsZero ? g.mClosestRange : std::min(aRMin, aRMax);
    g.mApertureRangeMax = std::max(aRMin, aRMax);
    return g;
}

void fqorvWriteGeometryFields(const CSpaceborneGeometry& theGeometry, const CDescriptionHeader& theSource,
                              CDescriptionHeader& theTarget)
{
    theTarget["Processing.PixelSpacingAz"].setValue(theGeometry.azimuthSpacing());
    theTarget["Processing.ResolutionAzimuth"].setValue(theGeometry.azimuthResolution());
    theTarget["Processing.PixelSpacingRg"].setValue(theGeometry.mRangeSpacing);
    theTarget["Processing.ResolutionRange"].setValue(1.4 * theGeometry.mRangeSpacing);
    CDescriptionField& aVelocity = theTarget["Processing.ProcessingVelocity"];
    if (aVelocity.getNbrOfElements() < 1) aVelocity.resize(1, 1);
    aVelocity.setValue(0, theGeometry.mIn.mVelocity);

    if (!fqorvHasValue(theSource, "Processing.UserDopCenRangeCoeff")) return;
    const double aUser = theSource["Processing.UserDopCenRangeCoeff"].getDouble(0, 0);
    CDescriptionField& aTable = theTarget["Processing.DopCenRangeCoeff"];
    const bool aTableForm = fqorvHasValue(theTarget, "Processing.DopplerEstimatedFlag") &&
                            std::strncmp(theTarget["Processing.DopplerEstimatedFlag"].getString(), "OK", 2) == 0;
    if (!aTable.isInitialised()) aTable.resize(1, aTableForm ? 3 : 1);
    for (int r = 0; r < aTable.getNbrOfRows(); ++r) aTable.setValue(r, aTableForm ? 2 : 0, aUser);
}

COmegaKParam fqorvBlockParam(const CSpaceborneGeometry& g, int theAzimuthFftSize, int theRangeFftSize, int theFirstColumn)
{
    COmegaKParam k;
    k.mAzimuthFftSize = theAzimuthFftSize;
    k.mRangeFftSize = theRangeFftSize;
    k.mPrf = g.mIn.mPrf;
    k.mSamplingRate = g.mIn.mSamplingRate;
    k.mCarrierFrequency = g.mIn.mCarrierFrequency;
    k.mVelocity = g.mIn.mVelocity;
    k.mNearRange = g.mIn.mNearRange + g.mRangeSpacing * theFirstColumn;
    k.mBandFraction = g.mIn.mBandFraction;
    k.mPresumming = g.mIn.mPresumming;
    k.mDecimation = g.mIn.mDecimation;
    return k;
}

void fqorvSubapertureAngles(const CSpaceborneGeometry& g, double theCentroid, double& ws, double& ws1, double& ws2)
{
    ws = aTwoPi * theCentroid / g.mIn.mPrf;
    if (ws < 0.0) ws += aTwoPi;
    ws1 = std::fmod(g.mIn.mPresumming * ws, aTwoPi);
    ws2 = std::fmod(g.mIn.mPresumming * g.mIn.mDecimation * ws, aTwoPi);
    fdfTrace("dop. cent.(Hz), ws ws1 ws2 (radians):  %f %f %f %f\n", theCentroid, ws, ws1, ws2);
}
