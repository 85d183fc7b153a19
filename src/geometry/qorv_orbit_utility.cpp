// The orbit build: state vectors of a header to one Earth-fixed position and velocity per line,
// then heading, orbit configuration and, when the header lacks it, the scene centre.
#include "qorv_orbit_utility.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "qorv_date.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_geo_fields.h"
#include "qorv_identifiers.h"

using namespace NQORV_GEO;

namespace {

constexpr double kPi = 3.14159265358979323846;
const char* const kAxes[3] = {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z"};

/// Looks of a header field: a negative integer n means one look out of |n| (1/|n|).
double looksValue(int theValue)
{
    return theValue < 0 ? 1.0 / -theValue : static_cast<double>(theValue);
}

/// Interpolator choice by sensor and vector count.
void chooseInterpolator(int theSensor, int theProduct, int n, bool& thePolynomial, bool& theNewMethod, int& theDegree)
{
    thePolynomial = false;
    theNewMethod = false;
    theDegree = 4;
    switch (theSensor) {
    case CSAR_SENSOR_RADARSAT1_ID:
    case CSAR_SENSOR_RADARSAT2_ID:
        thePolynomial = n >= 5;
        theNewMethod = n - 1 > 4;
        break;
    case CSAR_SENSOR_ERS1_ID:
    case CSAR_SENSOR_ERS2_ID:
    case CSAR_SENSOR_ENVISAT1_ID:
    case CSAR_SENSOR_ORBISAR1_ID:
    case CSAR_SENSOR_ALOS_PALSAR_ID:
    case CSAR_SENSOR_TSX1_ID:
        thePolynomial = true;
        theNewMethod = n - 1 > 4;
        break;
    case CSAR_SENSOR_JERS1_ID:
        if (theProduct == CQORV_ORIG_PROD_JERS_1_JAXA_SLC_ID) {
            thePolynomial = n - 1 > 4;
            theNewMethod = n - 1 > 4;
        } else {
            thePolynomial = true;
            theDegree = 2;
        }
        break;
    case CSAR_SENSOR_SIRC_ID:
        theDegree = 2;
        break;
    case CSAR_SENSOR_CSK_ID:
        thePolynomial = true;
        theNewMethod = true;
        fdfTrace("MAKE ORBIT CSK : %d\n", n);
        break;
    case CSAR_SENSOR_TELAER_ID:
        thePolynomial = true;
        theDegree = 0;  // unset: only the header's degree gives one
        break;
    default:
        break;
    }
}

/// Times of the rows of a line table taken at fractional input indices.
double tableTimeAt(const double* theT, int n, double theIndex)
{
    int i = static_cast<int>(std::floor(theIndex));
    i = std::clamp(i, 0, n - 2);
    return theT[i] + (theIndex - i) * (theT[i + 1] - theT[i]);
}

}  // namespace

// ------------------------------------------------------------------------------------------------

void YDF_ORBIT::orbit(const char* aParamFile, float aAzimuthPixelsShift, bool aUseHdrShift, CDescriptionHeader* aStore,
                      int aPadLines, int aLineFactor)
{
    // 1. Store, sensor, shift.
    std::unique_ptr<CDescriptionHeader> aOwn;
    std::string aFileName;
    CDescriptionHeader* h = aStore;
    if (h == nullptr) {
        aOwn = CDescriptionHeader::makeFull();
        const std::string aName = headerFileName(aParamFile == nullptr ? "" : aParamFile, false);
        fdfTrace("\nYDF_ORBIT::orbit()  - Read parameter file = %s", aName.c_str());
        aFileName = readHeaderByName(*aOwn, aParamFile == nullptr ? "" : aParamFile, false);
        if (aFileName.empty()) QORV_FATAL(CQORV_ERR_MISSING_FILE, ("Error: missing parameter file " + aName).c_str());
        h = aOwn.get();
    }
    CDescriptionHeader& aHdr = *h;
    mSensorId = fqorvSensorStrToID(getText(aHdr, "Sensor.SensorName"));
    std::string aOrigin;
    const int aProduct = fqorvGetUserKey(aHdr, "ORIGIN DATA", aOrigin) ? fqorvOrigProdStrToID(aOrigin.c_str()) : -1;
    if (beginsWith(aHdr, "StateVectorData.StateVectorReference", "IRS")) fqorvConvertStateVectorsToEcr(aHdr);

    double aShift = aAzimuthPixelsShift;
    if (aUseHdrShift && setField(aHdr, "OrbitCorrection.AzimuthPixelShift") != nullptr) {
        aShift = aHdr["OrbitCorrection.AzimuthPixelShift"].getDouble();
        fdfTrace("\nUsed Hdr aAzimuthPixelsShift = %f", aShift);
    } else {
        fdfTrace("\nUsed parameter aAzimuthPixelsShift = %f", aShift);
    }
    fdfTrace("\nMake orbit with azimuth pixels shift = %f\n", aShift);
    mAzimuthShift = aShift;
    mPadLines = aPadLines;
    mWindow = 0;
    mLineFactor = aLineFactor > 0 ? aLineFactor : 1;
    mInvLineFactor = 1.0 / mLineFactor;

    const int aLines = aHdr["RasterInfo.NrOfLinesPerImage"].getInteger();
    const double aPrf = aHdr["ChannelInfo.PRF"].getDouble(0);
    mLineTime = looksValue(getInteger(aHdr, "Processing.NAzimuthLooks", 1)) / aPrf;
    const double dt = mLineTime;
    mNrOfLines = static_cast<int>(aLines * mLineFactor) + 2 * aPadLines;
    const std::size_t aRows = static_cast<std::size_t>(std::max(mNrOfLines, 0));
    x.assign(aRows, 0.0);
    y.assign(aRows, 0.0);
    z.assign(aRows, 0.0);
    ti.assign(aRows, 0.0);

    // 2. Per-line table of ORBISAR-1 and TELAER.
    const bool aLineTableSensor = mSensorId == CSAR_SENSOR_ORBISAR1_ID || mSensorId == CSAR_SENSOR_TELAER_ID;
    const bool aHasLineTable = aLineTableSensor && setField(aHdr, "InitialGeometry.Projection") &&
                               setField(aHdr, "orbit_information.NumberOfAzimuthLines") &&
                               setField(aHdr, "orbit_information.Time") && setField(aHdr, "orbit_information.XPos") &&
                               setField(aHdr, "orbit_information.YPos") && setField(aHdr, "orbit_information.ZPos");
    if (aHasLineTable) {
        const int n = aHdr["orbit_information.NumberOfAzimuthLines"].getInteger();
        if (n != aLines) fdfTrace("aInStateVectorsNbr = %d\n", n);
        const CDescriptionField& aTime = aHdr["orbit_information.Time"];
        std::vector<double> aT(n), aP[3];
        const char* const aPos[3] = {"orbit_information.XPos", "orbit_information.YPos", "orbit_information.ZPos"};
        for (int i = 0; i < n; ++i) aT[i] = aTime.getDouble(i);
        for (int a = 0; a < 3; ++a) {
            aP[a].resize(n);
            for (int i = 0; i < n; ++i) aP[a][i] = aHdr[aPos[a]].getDouble(i);
        }
        const double s = (n == aLines) ? 1.0 : static_cast<double>(n) / aLines;
        for (std::size_t k = 0; k < aRows; ++k)
            ti[k] = tableTimeAt(aT.data(), n, ((static_cast<double>(k) - aPadLines) * mInvLineFactor + aShift) * s);
        std::vector<double>* aOut[3] = {&x, &y, &z};
        for (int a = 0; a < 3; ++a) {
            if (aShift == 0.0 && n == aLines && mLineFactor == 1.0 && aPadLines == 0)
                *aOut[a] = aP[a];
            else
                *aOut[a] = fqorvTensionSpline(aT.data(), aP[a].data(), n, ti.data(), mNrOfLines, 1.0);
        }
        fdfTrace("TBD NO USE STATE VECTOR for ORBISAT\n");
        mStateVectorNbr = n;
    } else {
        if (aLineTableSensor) fdfTrace("TBD USE STATE VECTOR for ORBISAT\n");
        // 3. State vectors and their steps.
        const int n = aHdr["StateVectorData.nStateVectors"].getInteger();
        if (n < 2) {
            fdfTrace("aInStateVectorsNbr = %d\n", n);
            QORV_FATAL(CQORV_ERR_NUMERIC_INPUT, "You need at least 2 state vectors!");
        }
        std::vector<double> aSteps;
        if (const CDescriptionField* f = setField(aHdr, "StateVectorData.TimeDeltaStepsFromFirst")) {
            const int aCount = f->getNbrOfElements();
            aSteps.resize(n);
            for (int i = 0; i < n; ++i) {
                if (i < aCount) aSteps[i] = f->getDouble(i) - f->getDouble(0);
                else if (i >= 2) aSteps[i] = aSteps[i - 1] + (aSteps[i - 1] - aSteps[i - 2]);
                else aSteps[i] = aSteps[i - 1];
            }
            fdfTrace("  LAST Time : %f\n", aSteps[n - 1]);
        }
        // 4. Time origin: the day before the earlier of "TimeFirst" and "AzimuthStartTime".
        const CQorvDate aFirst = fqorvParseDateField(aHdr["StateVectorData.TimeFirst"].getString(), "TimeFirst");
        const CQorvDate aStart =
            fqorvParseDateField(aHdr["AcquisitionParameters.AzimuthStartTime"].getString(), "AzimuthStartTime");
        if (const char* aStop = getText(aHdr, "AcquisitionParameters.AzimuthStopTime"))
            fqorvParseDateField(aStop, "AzimuthStopTime");
        mReferenceDay = std::min(aFirst.dayNumber(), aStart.dayNumber()) - 1;
        const double aStateVectorFirstTime = (aFirst.dayNumber() - mReferenceDay) * 86400.0 + aFirst.secondsOfDay();
        const double aImageBeginTime = (aStart.dayNumber() - mReferenceDay) * 86400.0 + aStart.secondsOfDay();
        const double aDelta = aSteps.empty() ? aHdr["StateVectorData.TimeDelta"].getDouble() : 0.0;
        mStateVectorTime.resize(n);
        for (int i = 0; i < n; ++i)
            mStateVectorTime[i] = aStateVectorFirstTime + (aSteps.empty() ? i * aDelta : aSteps[i]);
        for (std::size_t k = 0; k < aRows; ++k)
            ti[k] = static_cast<double>(k) * dt / mLineFactor + aShift * dt + (aImageBeginTime - aPadLines * dt);
        std::vector<double>* aSv[3] = {&mStateVectorX, &mStateVectorY, &mStateVectorZ};
        for (int a = 0; a < 3; ++a) {
            aSv[a]->resize(n);
            for (int i = 0; i < n; ++i) (*aSv[a])[i] = aHdr[kAxes[a]].getDouble(i);
        }
        mStateVectorNbr = n;
        // The store was rotated at the start when it said "IRS"; vectors still inertial are
        // rotated here one by one.
        if (beginsWith(aHdr, "StateVectorData.StateVectorReference", "IRS")) {
            fdfTrace("\n\ntransform IRS to ERC\n");
            const long aDays = aFirst.dayNumber() - fqorvDaysFromCivil(1975, 1, 1);
            for (int i = 0; i < n; ++i) {
                const double aTheta = fqorvGreenwichAngle(aDays, aFirst.secondsOfDay() + (mStateVectorTime[i] - aStateVectorFirstTime));
                fqorvRotateInertialToEarthFixed(aTheta, mStateVectorX[i], mStateVectorY[i]);
            }
        }

        // 5. Interpolator choice.
        chooseInterpolator(mSensorId, aProduct, n, mPolynomial, mNewMethod, mDegree);
        const int aDegOverride = getInteger(aHdr, "StateVectorData.OrbitPolinomialDeg", 0);
        if (aDegOverride > 0) mDegree = aDegOverride;
        fdfTrace("\n SELECTED ORBIT INTERPOLATION POLYNOMIAl DEG = %d ;  USE new method = %d\n", mDegree,
                 mNewMethod ? 1 : 0);

        // 6. Positions.
        std::vector<double>* aOut[3] = {&x, &y, &z};
        if (!mPolynomial) {
            for (int a = 0; a < 3; ++a)
                *aOut[a] = fqorvTensionSpline(mStateVectorTime.data(), aSv[a]->data(), n, ti.data(), mNrOfLines, 1.0);
        } else {
            if (n < 3) QORV_FATAL(CQORV_ERR_NUMERIC_INPUT, "");
            if (mNewMethod) {
                mWindow = n >= 10 ? 9 : 0;
                for (int a = 0; a < 3; ++a)
                    fqorv_pol_interp(mStateVectorTime.data(), aSv[a]->data(), n, mWindow, ti.data(), mNrOfLines,
                                     aOut[a]->data());
            } else {
                for (int a = 0; a < 3; ++a)
                    *aOut[a] = fqorvLeastSquaresPolynomial(mStateVectorTime.data(), aSv[a]->data(), n, mDegree,
                                                           ti.data(), mNrOfLines);
            }
        }
    }

    // 7. Velocities: central differences over the rows, divided by the whole line time.
    vx = deriv(x);
    vy = deriv(y);
    vz = deriv(z);
    for (std::size_t k = 0; k < aRows; ++k) {
        vx[k] /= dt;
        vy[k] /= dt;
        vz[k] /= dt;
    }

    // 8. Line direction and heading.
    if (const char* aDir = getText(aHdr, "InitialGeometry.TimeDirectionLines")) {
        if (std::strcmp(aDir, "INCREASE TIME DIRECTION") != 0 && std::strcmp(aDir, "DECREASE TIME DIRECTION") != 0) {
            fdfTrace("Time direction lines = [%s]\n", aDir);
            QORV_FATAL(CQORV_ERR_MANDATORY, "TimeDirectionLines");
        }
    }
    const int aMid = mNrOfLines / 2;
    if (setField(aHdr, "InitialGeometry.SceneHeading") != nullptr) {
        mHeading = aHdr["InitialGeometry.SceneHeading"].getDouble();
    } else {
        mHeading = vz[aMid] >= 0.0 ? 344.0 : 195.0;
        fdfTrace("ORBIT VEL [%d] [vz]= [%f]\n", aMid, vz[aMid]);
        aHdr["InitialGeometry.SceneHeading"].setValue(mHeading);
        const char* aConf = fqorvOrbitConfiguration(mHeading);
        aHdr["InitialGeometry.OrbitConfiguration"].setValue(aConf);
        fdfTrace("OrbitConfiguration = %s\n", aConf);
    }

    // 9. Scene centre, when the header has none.
    if (setField(aHdr, "RegistrationCoordinates.LatNorthing") == nullptr ||
        setField(aHdr, "RegistrationCoordinates.LonEasting") == nullptr) {
        double aSign = 1.0;
        if (setField(aHdr, "Sensor.AzimuthAngle") != nullptr) {
            const double aAngle = aHdr["Sensor.AzimuthAngle"].getDouble();
            fdfTrace("Sensoer.AzimuthAngle : %f\n", aAngle);
            aSign = aAngle > 0.0 ? 1.0 : -1.0;
            fdfTrace(aAngle > 0.0 ? "right looking\n" : "left looking\n");
        }
        const double aSpacing = aHdr["Processing.PixelSpacingRg"].getDouble();
        const double aMidRange = aHdr["Processing.SlantRange"].getDouble(0) +
                                 (aHdr["RasterInfo.NrOfPixelsPerLine"].getInteger() / 2) * aSpacing;
        const double aAlong = (mNrOfLines / 2) * aSpacing;  // the range spacing, also along track
        double aLat, aLon;
        fqorvEstimateSceneCentre(x[aMid], y[aMid], z[aMid], aMidRange, aAlong, mHeading, aSign, aLat, aLon);
        aHdr["RegistrationCoordinates.LatNorthing"].setValue(aLat * 180.0 / kPi);
        aHdr["RegistrationCoordinates.LonEasting"].setValue(aLon * 180.0 / kPi);
        const double aLatDeg = aHdr["RegistrationCoordinates.LatNorthing"].getDouble();
        fqorvSetUserKey(aHdr, "UTM_HEMISPHERE", aLatDeg >= 0.0 ? "NORTH" : "SOUTH");
        fqorvSetUserKey(aHdr, "UTM_ZONE",
                        std::to_string(fqorvUtmZone(aHdr["RegistrationCoordinates.LonEasting"].getDouble())).c_str());
    }

    if (!aFileName.empty() && !aHdr.write(aFileName.c_str(), false, false))
        QORV_FATAL(CQORV_ERR_WRITE_FILE, ("Error: missing parameter file " + aFileName).c_str());
    fdfTrace("\nMake orbit END = %d\n", mNrOfLines);
}

double YDF_ORBIT::meanAltitude(CDescriptionHeader& theStore)
{
    if (empty()) orbit(nullptr, 0.0f, false, &theStore, 0, 1);
    const int aMid = mNrOfLines / 2;
    const double r = std::sqrt(x[aMid] * x[aMid] + y[aMid] * y[aMid] + z[aMid] * z[aMid]);
    const double aLat = theStore["RegistrationCoordinates.LatNorthing"].getDouble() * kPi / 180.0;
    const double aLon = theStore["RegistrationCoordinates.LonEasting"].getDouble() * kPi / 180.0;
    const double a = CQORV_ALT_EARTH_A, b = CQORV_ALT_EARTH_B;
    const double e2 = (a * a - b * b) / (a * a);
    const double s = std::sin(aLat);
    const double aN = a / std::sqrt(1.0 - e2 * s * s);
    const double px = aN * std::cos(aLat) * std::cos(aLon), py = aN * std::cos(aLat) * std::sin(aLon);
    const double pz = aN * (1.0 - e2) * s;
    return r - std::sqrt(px * px + py * py + pz * pz);
}

// ------------------------------------------------------------------------------------------------

void fqorvConvertStateVectorsToEcr(CDescriptionHeader& theStore)
{
    if (!beginsWith(theStore, "StateVectorData.StateVectorReference", "IRS")) return;
    const int n = theStore["StateVectorData.nStateVectors"].getInteger();
    const CQorvDate aFirst = fqorvParseDateField(theStore["StateVectorData.TimeFirst"].getString(), "TimeFirst");
    const double aDelta = theStore["StateVectorData.TimeDelta"].getDouble();
    const long aDays = aFirst.dayNumber() - fqorvDaysFromCivil(1975, 1, 1);
    CDescriptionField& aX = theStore["StateVectorData.pos_x"];
    CDescriptionField& aY = theStore["StateVectorData.pos_y"];
    for (int i = 0; i < n; ++i) {
        double px = aX.getDouble(i), py = aY.getDouble(i);
        fqorvRotateInertialToEarthFixed(fqorvGreenwichAngle(aDays, aFirst.secondsOfDay() + i * aDelta), px, py);
        aX.setValue(i, px);
        aY.setValue(i, py);
    }
    // The vector nearest in time to the image centre.
    if (const char* aStartText = getText(theStore, "AcquisitionParameters.AzimuthStartTime")) {
        const CQorvDate aStart = fqorvParseDateField(aStartText, "AzimuthStartTime");
        double aStartSec = aStart.secondsOfDay();
        if (aFirst.dayNumber() < aStart.dayNumber()) aStartSec += 86400.0;
        const double aCentre = aStartSec + theStore["RasterInfo.NrOfLinesPerImage"].getInteger() /
                                               (2.0 * theStore["ChannelInfo.PRF"].getDouble(0));
        int aNearest = 0;
        for (int i = 1; i < n; ++i)
            if (std::fabs(aFirst.secondsOfDay() + i * aDelta - aCentre) <
                std::fabs(aFirst.secondsOfDay() + aNearest * aDelta - aCentre))
                aNearest = i;
        fdfTrace("State vector nearest to the image centre : %d\n", aNearest);
    }
    theStore["StateVectorData.StateVectorReference"].setValue("ECR");
    const CDescriptionField* aAlt = setField(theStore, "InitialGeometry.MeanAltitude");
    if (aAlt == nullptr || std::isnan(aAlt->getDouble())) {
        YDF_ORBIT aOrbit;
        const double aAltitude = aOrbit.meanAltitude(theStore);
        theStore["InitialGeometry.MeanAltitude"].setValue(aAltitude);
        fdfTrace("MeanAltitude = %f\n", aAltitude);
    }
}
