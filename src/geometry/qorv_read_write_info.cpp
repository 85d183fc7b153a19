// read_image_info: the header of one SAR image turned into YDF_SAR, one meaning per field.
#include "qorv_read_write_info.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "qorv_cell_types.h"
#include "qorv_date.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_geo_fields.h"
#include "qorv_identifiers.h"
#include "qorv_orbit_utility.h"

using namespace NQORV_GEO;

namespace {

constexpr double kC = 299792458.0;
constexpr double kTwoOverC = 6.671281903963041e-09;  // 2 / c, s/m
constexpr double kPi = 3.14159265358979323846;

/// Prints of the Doppler getter left in this run (the sensor ids are shown three times).
int gDopplerPrintsLeft = 3;

/// The settings that switch the Doppler model or the calibration off ("YES" turns them on).
bool settingOn(const char* theKey)
{
    return fdfSettingsExist() && fdfGetSetting(theKey) == "YES";
}

double looksValue(int theValue)
{
    return theValue < 0 ? 1.0 / -theValue : static_cast<double>(theValue);
}

bool isProduct(int theId, std::initializer_list<int> theIds)
{
    return std::find(theIds.begin(), theIds.end(), theId) != theIds.end();
}

/// Polynomial sum c0 + c1 x + ... of theCount coefficients (Horner).
double polynomial(const double* theCoeff, int theCount, double x)
{
    double v = 0.0;
    for (int i = theCount - 1; i >= 0; --i) v = v * x + theCoeff[i];
    return v;
}

const char* const kReverseSections[CQORV_ALL_SECTIONS_NBR] = {
    "GCPRasterInfo", "Baseline", "OrbitCorrection", "StateVectorCalc", "StateVectorData", "InitialGeometry",
    "Processing", "RasterInfo", "PolarimetricCalibrationParameters", "interferometric_processing",
    "sar_processing", "orbit_information", "Sensor", "ChannelInfo", "AcquisitionParameters", "DEMCoordinates",
    "RegistrationCoordinates", "CartographicSystem", "user_defined_section", "EnvisatFixHeader",
    "EnvisatDescriptionRecord"};

// --- the stages of read_image_info ------------------------------------------------------------

void resetRecord(YDF_SAR& s)
{
    s.units.clear();
    s.mRangeDopplerFref.clear();
    s.mRangeDopplerFrefSize = 0;
    s.mRangeDopplerFrefScale = 1.0;
    s.mBetaNoughtCoeff.clear();
    s.mBetaNoughtNbr = 0;
    s.mDopplerTable.clear();
    s.mDopplerTableFlag = false;
    s.mDopplerTableEstimated = false;
    s.mDopplerTableRows = s.mDopplerTableCols = 0;
    s.mDopplerTableTimeSpan = s.mDopplerTableImageOffset = 0.0;
    s.mDopplerCoeff.fill(0.0);
    s.mSlantDistToImagePosition.fill(0.0);
    s.mImagePositionToSlantDist.fill(0.0);
    s.mGroundToSlantPosition.fill(0.0);
    s.mSlantToGroundPosition.fill(0.0);
    s.mSlantDistToImagePositionNbr = s.mImagePositionToSlantDistNbr = 0;
    s.mGroundToSlantPositionNbr = s.mSlantToGroundPositionNbr = 0;
    s.mAntennaTable.clear();
    s.mAntennaTableNbr = 0;
    s.mAntennaIncrement = 0.1;
    s.mAntennaCentre = 0.0;
    s.mBeamName.clear();
    s.mScanSarTable.clear();
    s.mScanSarSampleNbr = 0;
    s.mSlantRangeRef = s.mSlantRangeExp = -1.0;
    s.mRangePixelShift = 0.0;
    s.bore = 0.0;
    s.kpro = 1.0;
    s.mRangeScaleFactor = 1;
    s.mUnwrappingThreshold = -1.0f;
    s.mCos35 = static_cast<float>(std::cos(35.0 * kPi / 180.0));
    s.mGroundRange = false;
    s.mEnvisatDoppCorr = false;
    if (s.mBlockSize1 < 500) s.mBlockSize1 = 2500;
    if (s.mBlockSize2 < 10) s.mBlockSize2 = 50;
}

/// First column and first line of this raster in the original acquisition.
void readImagePosition(const CDescriptionHeader& h, YDF_SAR& s)
{
    std::string aFirst, aLast, aOrigin;
    s.aColStart = 0;
    if (fqorvGetOtherInfo(h, "FIRST PIXEL POSITION", aFirst) && fqorvGetOtherInfo(h, "LAST PIXEL POSITION", aLast) &&
        fqorvGetOtherInfo(h, "ORIGIN PIXEL NUMBER", aOrigin)) {
        const char* aDir = getText(h, "InitialGeometry.TimeDirectionPixel");
        if (aDir == nullptr || std::strcmp(aDir, "INCREASE TIME DIRECTION") == 0)
            s.aColStart = std::atoi(aFirst.c_str());
        else if (std::strcmp(aDir, "DECREASE TIME DIRECTION") == 0)
            s.aColStart = std::atoi(aOrigin.c_str()) - std::atoi(aLast.c_str()) - 1;
    }
    // The line flag and nrow of the record as they stand (a previous image's on a reused record).
    std::string aLine;
    s.mOrigAzStart = 0;
    if (fqorvGetOtherInfo(h, s.mLineIncrease ? "FIRST LINE POSITION" : "LAST LINE POSITION", aLine)) {
        const double v = std::atof(aLine.c_str());
        s.mOrigAzStart = s.mLineIncrease ? static_cast<int>(v) : static_cast<int>(s.nrow - v - 1);
    }
    std::string aProduct;
    s.mOriginProductTypeId = fqorvGetOtherInfo(h, "ORIGIN DATA", aProduct) ? fqorvOrigProdStrToID(aProduct.c_str()) : -1;
}

void readRasterFacts(const CDescriptionHeader& h, YDF_SAR& s)
{
    s.ncol = h["RasterInfo.NrOfPixelsPerLine"].getInteger();
    s.nrow = h["RasterInfo.NrOfLinesPerImage"].getInteger();
    s.mNumberCols = s.ncol;
    s.mNumberColsSlantRange = s.ncol;
    s.cbeg = 0;
    s.cend = s.ncol - 1;
    s.lbeg = 0;
    s.lend = s.nrow - 1;
    s.scol = s.cend - s.cbeg + 1;
    s.srow = s.lend - s.lbeg + 1;
    s.mHeaderOffset = getInteger(h, "RasterInfo.HeaderOffset", 0);
    s.mRowPrefix = getInteger(h, "RasterInfo.RowPrefix", 0);
    const char* aCell = getText(h, "RasterInfo.CellType");
    s.mCellType = aCell == nullptr ? -1 : fqorvCellTypeFromName(aCell);
    const char* aUnits = getText(h, "RasterInfo.DataUnits");
    s.mDataUnits = aUnits == nullptr ? -1 : fqorvDataUnitsFromName(aUnits);
    s.mNullValue = s.mNullValue2 = static_cast<float>(getDouble(h, "RasterInfo.NullCellValue", -9999.0));
    const char* aType = getText(h, "Processing.ProcessingType");
    s.mEnvisatDoppCorr = aType != nullptr && std::strcmp(aType, "ENVISAT_DOPP_CORR") == 0;
    if (setField(h, "RasterInfo.RescalingMinValue") && setField(h, "RasterInfo.RescalingScaleValue")) {
        s.mRescalingMin = h["RasterInfo.RescalingMinValue"].getDouble();
        s.mRescalingScale = h["RasterInfo.RescalingScaleValue"].getDouble();
    } else {
        s.mRescalingMin = s.mRescalingScale = -9999.0;
    }
    std::string aThreshold;
    if (fqorvGetOtherInfo(h, "UNWRAPPING COHERENCE THRSHOLD", aThreshold))
        s.mUnwrappingThreshold = static_cast<float>(std::atof(aThreshold.c_str()));
}

void readStartTime(const CDescriptionHeader& h, YDF_SAR& s)
{
    const bool aLineTable = s.mSensorId == CSAR_SENSOR_ORBISAR1_ID || s.mSensorId == CSAR_SENSOR_TELAER_ID;
    if (aLineTable && setField(h, "orbit_information.Time")) {
        s.time_start = h["orbit_information.Time"].getDouble(0);
        s.mStartDay = 0;
        return;
    }
    fqorvParseDateField(h["StateVectorData.TimeFirst"].getString(), "TimeFirst");
    const CQorvDate aStart =
        fqorvParseDateField(h["AcquisitionParameters.AzimuthStartTime"].getString(), "AzimuthStartTime");
    s.time_start = aStart.secondsOfDay();
    s.mStartDay = static_cast<int>(aStart.dayNumber());
}

void readRadarAndGeometry(const CDescriptionHeader& h, YDF_SAR& s)
{
    if (setField(h, "RegistrationCoordinates.LatNorthing")) {
        s.centerlat = h["RegistrationCoordinates.LatNorthing"].getDouble();
        s.centerlon = getDouble(h, "RegistrationCoordinates.LonEasting", 0.0);
    }
    if (const char* u = getText(h, "CartographicSystem.Units")) s.units = u;
    s.prf = h["ChannelInfo.PRF"].getDouble(0);
    s.mNumberOfAzimuthLooks = looksValue(getInteger(h, "Processing.NAzimuthLooks", 1));
    s.mNumberOfRangeLooks = looksValue(getInteger(h, "Processing.NRangeLooks", 1));
    s.mReplicaPower = getDouble(h, "ChannelInfo.CalReplicaPower", 0.0);
    s.lam = kC / h["ChannelInfo.CarrierFrequency"].getDouble(0);
    s.lam2 = 2.0 / s.lam;
    s.mFourPiOverLambda = 4.0 * kPi / s.lam;
    const char* aLines = getText(h, "InitialGeometry.TimeDirectionLines");
    s.mLineIncrease = !(aLines != nullptr && std::strcmp(aLines, "DECREASE TIME DIRECTION") == 0);
    const char* aPixels = getText(h, "InitialGeometry.TimeDirectionPixel");
    s.mPixelIncrease = !(aPixels != nullptr && std::strcmp(aPixels, "DECREASE TIME DIRECTION") == 0);
    s.mAscending = true;
    s.mSceneHeading = 344.0;
    if (const char* aConf = getText(h, "InitialGeometry.OrbitConfiguration")) {
        if (std::strcmp(aConf, "ASCENDING") == 0) {
            s.mAscending = true;
            s.mSceneHeading = 344.0;
        } else if (std::strcmp(aConf, "DESCENDING") == 0) {
            s.mAscending = false;
            s.mSceneHeading = 195.0;
        }
    }
    s.mSceneHeading = getDouble(h, "InitialGeometry.SceneHeading", s.mSceneHeading);
    s.mRightLooking = true;
    if (setField(h, "Sensor.AzimuthAngle")) {
        const double a = h["Sensor.AzimuthAngle"].getDouble();
        if (a < 0.0) s.mRightLooking = false;
        else if (a > 0.0) s.mRightLooking = true;
    }
    s.mid_incid = setField(h, "ChannelInfo.IncidenceAngle") ? h["ChannelInfo.IncidenceAngle"].getDouble() * kPi / 180.0 : -1.0;
    s.mAzimuthPixelSpacing = getDouble(h, "Processing.PixelSpacingAz", 0.0);
    s.mRangePixelSpacing = h["Processing.PixelSpacingRg"].getDouble();
    s.mSlantPixelSpacing = s.mRangePixelSpacing;
    s.mDopplerRefTime = getDouble(h, "Processing.DopCenRgRefTime", 0.0);
    if (const CDescriptionField* f = setField(h, "Processing.FastTime")) s.mFastTime = f->getDouble(0);
    if (const char* aMode = getText(h, "Sensor.SARMode")) {
        const char* const aModes[3] = {"SPOTLIGHT", "STRIPMAP", "SCANSAR"};
        for (int m = 0; m < 3; ++m)
            if (std::strncmp(aMode, aModes[m], std::strlen(aModes[m])) == 0) s.mSARMode = m;
    }
}

void readNearRange(const CDescriptionHeader& h, YDF_SAR& s)
{
    if (const CDescriptionField* f = setField(h, "Processing.RangeDoppler_fref")) {
        const int n = f->getNbrOfElements();
        if (n != s.ncol) {
            fdfTrace("NrOfPixelsPerLine : %d\n", s.ncol);
            fdfTrace("Size of RangeDoppler_fref : %d\n", n);
            QORV_FATAL(CQORV_ERR_RASTER_ACCESS, "Size of RangeDoppler_fref");
        }
        s.mRangeDopplerFref.resize(n);
        for (int i = 0; i < n; ++i) s.mRangeDopplerFref[i] = f->getDouble(i);
        s.mRangeDopplerFrefSize = n;
        s.mRangeDopplerFrefScale = 1.0;
    }
    s.mNearSlantRange = h["Processing.SlantRange"].getDouble(0);
    s.mNearSlantRangeConv = s.mNearSlantRangeGround = s.mNearSlantRange;
}

/// The matrix of "Processing.DopCenRangeCoeff" as the Doppler table (rows of day, seconds of
/// day, coefficients); the user's constant term replaces that of every row.
void loadDopplerTable(const CDescriptionField& f, YDF_SAR& s, int theMinRows, const double* theUserC0)
{
    const int aRows = f.getNbrOfRows(), aCols = f.getNbrOfElements();
    if (aRows < theMinRows || aCols < 3) return;
    s.mDopplerTable.assign(aRows, std::vector<double>(aCols, 0.0));
    for (int r = 0; r < aRows; ++r)
        for (int c = 0; c < aCols; ++c) s.mDopplerTable[r][c] = f.isSet(r, c) ? f.getDouble(r, c) : 0.0;
    if (theUserC0 != nullptr)
        for (auto& aRow : s.mDopplerTable) aRow[2] = *theUserC0;
    s.mDopplerTableRows = aRows;
    s.mDopplerTableCols = aCols;
    s.mDopplerTableFlag = true;
    const auto& r0 = s.mDopplerTable[0];
    if (aRows >= 2) {
        const auto& r1 = s.mDopplerTable[1];
        s.mDopplerTableTimeSpan = (r1[0] - r0[0]) * 86400.0 + (r1[1] - r0[1]);
    }
    s.mDopplerTableImageOffset = (s.mStartDay - r0[0]) * 86400.0 + (s.time_start - r0[1]);
}

void readDopplerModel(const CDescriptionHeader& h, YDF_SAR& s)
{
    s.mUseDopplerFlag = !settingOn("QORVEX_DISABLE_DOPPLER");
    const CDescriptionField* aCoeff = setField(h, "Processing.DopCenRangeCoeff");
    const char* aFlag = getText(h, "Processing.DopplerEstimatedFlag");
    const CDescriptionField* aUser = setField(h, "Processing.UserDopCenRangeCoeff");
    double aUserC0 = 0.0;
    const double* aUserPtr = nullptr;
    if (aUser != nullptr && aUser->isSet(0, 0)) {
        aUserC0 = aUser->getDouble(0, 0);
        aUserPtr = &aUserC0;
    }
    const int id = s.mSensorId, p = s.mOriginProductTypeId;
    if (aCoeff != nullptr && aFlag != nullptr && std::strcmp(aFlag, "OK") == 0) {
        // The estimator's table, for every sensor; the steps evaluate it whatever table flag they pass.
        loadDopplerTable(*aCoeff, s, 1, aUserPtr);
        s.mDopplerTableEstimated = s.mDopplerTableFlag;
    } else {
        // As imported: one row of coefficients, lowest first.
        if (aCoeff != nullptr && aCoeff->getNbrOfRows() == 1) {
            const int n = std::min(aCoeff->getNbrOfElements(), 16);
            for (int i = 0; i < n; ++i) s.mDopplerCoeff[i] = aCoeff->isSet(0, i) ? aCoeff->getDouble(0, i) : 0.0;
        }
        const bool aTableProduct =
            (id == CSAR_SENSOR_TSX1_ID && p >= CQORV_ORIG_PROD_TSX1_SSC_HS_SINGLE_ID && p <= CQORV_ORIG_PROD_TSX1_SSC_SL_DUAL_ID) ||
            (id == CSAR_SENSOR_SARLUPE_ID && s.mSARMode == 0) ||
            (id == CSAR_SENSOR_CSK_ID &&
             isProduct(p, {CQORV_ORIG_PROD_CSK_SCS_B_ENHANCED_SPOTLIGHT_ID, CQORV_ORIG_PROD_CSK_SCS_B_SMART_ID,
                           CQORV_ORIG_PROD_CSK_SCS_U_ENHANCED_SPOTLIGHT_ID, CQORV_ORIG_PROD_CSK_SCS_U_SMART_ID}));
        if (aTableProduct && aCoeff != nullptr && !(aFlag != nullptr && std::strncmp(aFlag, "NotOK", 5) == 0))
            loadDopplerTable(*aCoeff, s, 2, nullptr);
        if (id == CSAR_SENSOR_RADARSAT1_ID && s.mUseDopplerFlag) {
            if (aCoeff == nullptr || aCoeff->getNbrOfElements() == 0) {
                s.mUseDopplerFlag = false;
            } else {
                int k = 0;
                for (int r = 0; r < aCoeff->getNbrOfRows() && k < 16; ++r)
                    for (int c = 0; c < aCoeff->getNbrOfElements() && k < 16; ++c)
                        s.mDopplerCoeff[k++] = aCoeff->isSet(r, c) ? aCoeff->getDouble(r, c) : 0.0;
            }
            fdfTrace("RADARSAT mUseDopplerFlag =  %d Coeff =  %f\n", s.mUseDopplerFlag ? 1 : 0, s.mDopplerCoeff[0]);
        }
        if (aUserPtr != nullptr) s.mDopplerCoeff[0] = aUserC0;
    }
    fdfTrace(s.mUseDopplerFlag ? "USE Doppler\n" : "NO USE Doppler\n");
    const double r0 = s.mNearSlantRange, rh = r0 + (s.ncol / 2) * s.mRangePixelSpacing,
                 rl = r0 + (s.ncol - 1) * s.mRangePixelSpacing;
    fdfTrace("Slant Range 0 = %f\nDoppler Slant Range 0 = %f\n", r0, s.getDopplerFromSlantRangeDist(r0, 0.0, true, true));
    fdfTrace("Slant Range H = %f\nDoppler Slant Range H = %f\n", rh, s.getDopplerFromSlantRangeDist(rh, 0.0, true, true));
    fdfTrace("Slant Range L = %f\nDoppler Slant Range L = %f\n", rl, s.getDopplerFromSlantRangeDist(rl, 0.0, true, true));
}

/// Copies up to 15 coefficients of a vector field into a 16-slot table; the last slot is the reference.
int copyConversion(const CDescriptionHeader& h, const char* theNbr, const char* theValues, std::array<double, 16>& theTable,
                   double theReference)
{
    const CDescriptionField* aN = setField(h, theNbr);
    const CDescriptionField* aV = setField(h, theValues);
    if (aN == nullptr || aV == nullptr) return -1;
    const int n = std::min({aN->getInteger(), aV->getNbrOfElements(), 15});
    for (int i = 0; i < n; ++i) theTable[i] = aV->getDouble(i);
    theTable[15] = theReference;
    return n;
}

void readRangeConversion(const CDescriptionHeader& h, YDF_SAR& s)
{
    const char* aProjection = getText(h, "InitialGeometry.Projection");
    const int id = s.mSensorId;
    const double sp = s.mRangePixelSpacing, r0 = s.mNearSlantRange;
    if (aProjection != nullptr && std::strcmp(aProjection, "SLANT_RANGE") == 0) {
        // pixel = -R0/spacing + R/spacing, and back R = R0 + pixel spacing. TSX-1 and COSMO-SkyMed
        // keep the reversed sign of their own products.
        const bool aReversed = id == CSAR_SENSOR_TSX1_ID || id == CSAR_SENSOR_CSK_ID;
        s.mSlantDistToImagePosition[0] = (aReversed ? r0 : -r0) / sp;
        s.mSlantDistToImagePosition[1] = 1.0 / sp;
        s.mSlantDistToImagePosition[15] = r0;
        s.mSlantDistToImagePositionNbr = 2;
        s.mImagePositionToSlantDist[0] = r0;
        s.mImagePositionToSlantDist[1] = sp;
        s.mImagePositionToSlantDist[15] = r0;
        s.mImagePositionToSlantDistNbr = 2;
    } else {
        s.mGroundRange = true;
        std::string aOrigin;
        const bool aHasOrigin = fqorvGetOtherInfo(h, "ORIGIN DATA", aOrigin);
        const char* aPrecise = nullptr;
        if ((!aHasOrigin || aOrigin == "ers_pri") && getInteger(h, "Processing.OriginalGroundToSlantNbr", 0) > 0)
            aPrecise = "ERS PRI ground to slant tables";
        else if ((id == CSAR_SENSOR_TSX1_ID || id == CSAR_SENSOR_RADARSAT2_ID) &&
                 setField(h, "Processing.PreciseOriginalSlantToGroundPolNbr"))
            aPrecise = "precise slant to ground tables";
        else if (id == CSAR_SENSOR_CSK_ID && setField(h, "Processing.PreciseOriginalGroundToSlantNbr"))
            aPrecise = "precise ground to slant tables";
        else if (setField(h, "Processing.PreciseOriginalGroundToSlantAzimuthPolNbr"))
            aPrecise = "precise ground to slant azimuth tables";
        if (aPrecise != nullptr) {
            fdfTrace("Ground range image with %s: not supported\n", aPrecise);
            QORV_FATAL(CQORV_ERR_WRONG_REQUEST, (std::string(aPrecise) + " not supported").c_str());
        }
        s.mSlantDistToImagePositionNbr = copyConversion(h, "Processing.SlantDistToGroundPositionNbr",
                                                        "Processing.SlantDistToGroundPosition", s.mSlantDistToImagePosition, r0);
        s.mImagePositionToSlantDistNbr = copyConversion(h, "Processing.GroundPositionToSlantDistNbr",
                                                        "Processing.GroundPositionToSlantDist", s.mImagePositionToSlantDist, r0);
        if (s.mSlantDistToImagePositionNbr < 0 || s.mImagePositionToSlantDistNbr < 0)
            QORV_FATAL(CQORV_ERR_RASTER_ACCESS, "You need Ground to Slant range coefficients");
        if (setField(h, "Processing.NColSlantRange"))
            s.mNumberColsSlantRange = static_cast<int>(h["Processing.NColSlantRange"].getDouble());
        s.mRangeScaleFactor = getInteger(h, "Processing.FromInImageRangeLooks", 1);
        s.mSlantPixelSpacing = getDouble(h, "Processing.PixelSpacingSlantRg", s.mSlantPixelSpacing);
    }
    s.mGroundToSlantPositionNbr = std::max(0, copyConversion(h, "Processing.GroundToSlantPositionNbr",
                                                             "Processing.GroundToSlantPosition", s.mGroundToSlantPosition, r0));
    s.mSlantToGroundPositionNbr = std::max(0, copyConversion(h, "Processing.SlantToGroundPositionNbr",
                                                             "Processing.SlantToGroundPosition", s.mSlantToGroundPosition, r0));
}

void readCalibration(const CDescriptionHeader& h, YDF_SAR& s)
{
    s.mSlantRangeRef = s.mSlantRangeExp = -1.0;
    if (s.mSensorId == CSAR_SENSOR_CSK_ID) {
        fdfTrace("******** CSK1 CALIBRATION CONST COMPUTATION -  START\n");
        s.kpro = 1.0;
        if (getInteger(h, "ChannelInfo.CSK_CalibrationConstantCompensationFlag", -1) == 0 &&
            setField(h, "ChannelInfo.CalConstProc") && !settingOn("QORVEX_DISABLE_CALIBRATION"))
            s.kpro = 1.0 / std::sqrt(std::pow(10.0, h["ChannelInfo.CalConstProc"].getDouble() / 10.0));  // dB to linear
        if (setField(h, "ChannelInfo.CSK_RescalingFactor")) s.kpro /= h["ChannelInfo.CSK_RescalingFactor"].getDouble();
        const char* aInc = getText(h, "ChannelInfo.CSK_IncidenceAngleCompensationGeometry");
        const double aRefInc = getDouble(h, "ChannelInfo.CSK_ReferenceIncidenceAngle", 0.0);
        if (aInc != nullptr && std::strcmp(aInc, "NONE") != 0 && aRefInc > 0.0)
            s.kpro *= std::sqrt(std::fabs(std::sin(aRefInc * kPi / 180.0)));
        const char* aLoss = getText(h, "ChannelInfo.CSK_RangeSpreadingLossCompensationGeometry");
        const double aRef = getDouble(h, "ChannelInfo.CSK_ReferenceSlantRange", 0.0);
        const double aExp = getDouble(h, "ChannelInfo.CSK_ReferenceSlantRangeExponent", 0.0);
        if (aLoss != nullptr && std::strcmp(aLoss, "NONE") != 0 && aRef > 0.0 && aExp > 0.0) {
            s.mSlantRangeRef = aRef;
            s.mSlantRangeExp = aExp;
            s.kpro *= std::pow(aRef, aExp);
        }
    } else {
        s.kpro = getDouble(h, "ChannelInfo.CalConstProc", 1.0);
        if (s.mSensorId == CSAR_SENSOR_ALOS_PALSAR_ID && s.kpro < -80.0) s.kpro = std::pow(10.0, s.kpro / 10.0);
    }
    fdfTrace("Calibration constant : %g\nReplica Power : %g\n", s.kpro, s.mReplicaPower);
}

std::vector<double> vectorOf(const CDescriptionField& f)
{
    std::vector<double> v(static_cast<std::size_t>(f.getNbrOfElements()));
    for (std::size_t i = 0; i < v.size(); ++i) v[i] = f.getDouble(static_cast<int>(i));
    return v;
}

/// The RADARSAT look-up table resampled to every column of this image.
void readScanSarLookup(const CDescriptionHeader& h, YDF_SAR& s, int theSamples)
{
    const CDescriptionField* f = setField(h, "ChannelInfo.RadarsatLookupTable");
    if (f == nullptr) return;
    std::vector<double> v = vectorOf(*f);
    const int n = std::min(theSamples, static_cast<int>(v.size()));
    if (n < 2) return;
    for (int i = 2; i < n; ++i)
        if (std::isnan(v[i]) || std::fabs(v[i]) <= 1.1754943508222875e-38) v[i] = 2.0 * v[i - 1] - v[i - 2];
    const int aCols = s.ncol;
    const double aStep = static_cast<double>(aCols) / n;
    std::vector<double> aKnots(n), aColumns(aCols);
    for (int i = 0; i < n; ++i) aKnots[i] = i * aStep;
    for (int c = 0; c < aCols; ++c) aColumns[c] = c;
    const std::vector<double> aAll = fqorvTensionSpline(aKnots.data(), v.data(), n, aColumns.data(), aCols, 1.0);
    const int aStart = std::clamp(s.mPixelIncrease ? s.aColStart : aCols - s.aColStart - s.ncol, 0, aCols - 1);
    s.mScanSarTable.assign(aAll.begin() + aStart, aAll.end());
    s.mScanSarTable.resize(static_cast<std::size_t>(s.ncol), s.mScanSarTable.empty() ? 0.0 : s.mScanSarTable.back());
    s.mScanSarSampleNbr = s.ncol;
}

void readAntennaTables(const CDescriptionHeader& h, YDF_SAR& s)
{
    const int id = s.mSensorId;
    if (id == CSAR_SENSOR_RADARSAT1_ID || id == CSAR_SENSOR_RADARSAT2_ID) {
        s.mAntennaCentre = getDouble(h, "ChannelInfo.RadarsatLookAngle", 0.0);
        s.mAntennaTableNbr = getInteger(h, "ChannelInfo.RadarsatBeamTabSize", 0);
        s.mAntennaIncrement = getDouble(h, "ChannelInfo.RadarsatBeamTabInc", 0.1);
        const int aSamples = getInteger(h, "ChannelInfo.RadarsatNumberOfSamples", 0);
        if (id == CSAR_SENSOR_RADARSAT1_ID) {
            if (const CDescriptionField* f = setField(h, "ChannelInfo.RadarsatBeamTable")) s.mAntennaTable = vectorOf(*f);
            if (const char* b = getText(h, "ChannelInfo.RadarsatBeamType")) s.mBeamName = std::string(b).substr(0, 16);
        }
        if (aSamples > 9) readScanSarLookup(h, s, aSamples);
    } else if (id == CSAR_SENSOR_ALOS_PALSAR_ID) {
        const int n = getInteger(h, "ChannelInfo.PalsarAGP_NumberOfSample", 0);
        const CDescriptionField* aAngles = setField(h, "ChannelInfo.PalsarAGP_OffNadirAngleVector");
        const CDescriptionField* aGains = setField(h, "ChannelInfo.PalsarAGP_RelAGPPNormByBeakVector");
        if (n > 512 && setField(h, "ChannelInfo.PalsarAGP_BeamId") && setField(h, "ChannelInfo.PalsarAGP_PolarizationId") &&
            aAngles != nullptr && aGains != nullptr) {
            std::vector<double> a = vectorOf(*aAngles);
            const double a0 = a.empty() ? 0.0 : a[0];
            for (double& v : a) v -= a0;
            s.mAntennaTable = a;
            const std::vector<double> g = vectorOf(*aGains);
            s.mAntennaTable.insert(s.mAntennaTable.end(), g.begin(), g.end());
            s.mAntennaTableNbr = n;
            s.mAntennaIncrement = getDouble(h, "ChannelInfo.PalsarAGP_OffNadirAngleIncrement", 0.1);
        }
    } else if (id == CSAR_SENSOR_ENVISAT1_ID ||
               ((id == CSAR_SENSOR_ERS1_ID || id == CSAR_SENSOR_ERS2_ID) &&
                s.mOriginProductTypeId == CQORV_ORIG_PROD_ENVISAT_ERS_SLC_ID)) {
        if (s.mGroundRange) {
            const int n = getInteger(h, "ChannelInfo.EnvisatAntennaElevationPatternNbr", 0);
            const CDescriptionField* aAngles = setField(h, "ChannelInfo.EnvisatElevationAnglesTable");
            const CDescriptionField* aPattern = setField(h, "ChannelInfo.EnvisatTwoWayElevationPatternTable");
            if (n > 0 && aAngles != nullptr && aPattern != nullptr) {
                s.mAntennaTable = vectorOf(*aAngles);
                const std::vector<double> g = vectorOf(*aPattern);
                s.mAntennaTable.insert(s.mAntennaTable.end(), g.begin(), g.end());
                s.mAntennaTableNbr = n;
                s.mAntennaCentre = s.mAntennaTable[std::min<std::size_t>((n + 1) / 2, s.mAntennaTable.size() - 1)];
                if (const char* b = getText(h, "ChannelInfo.EnvisatAntennaElevationBeamID")) s.mBeamName = std::string(b).substr(0, 3);
            }
        } else {
            const int n = getInteger(h, "ChannelInfo.EnvisatTwoWayAntennaElevationPatternTableNbr", 0);
            const CDescriptionField* f = setField(h, "ChannelInfo.EnvisatTwoWayAntennaElevationPatternTable");
            if (n > 0 && f != nullptr && f->getNbrOfElements() == n) {
                s.mAntennaTable = vectorOf(*f);
                s.mAntennaTableNbr = n;
                s.mAntennaCentre = getDouble(h, "ChannelInfo.EnvisatReferenceElevationAngle", 0.0);
            } else {
                s.mAntennaTableNbr = 0;
            }
        }
    }
}

}  // namespace

// ------------------------------------------------------------------------------------------------

YDF_SAR::YDF_SAR()
{
    mCos35 = static_cast<float>(std::cos(35.0 * kPi / 180.0));
}

double YDF_SAR::getDopplerFromSlantRangeDist(double theSlantRange, double theLine, bool theUseTable, bool thePerPixel)
{
    if (gDopplerPrintsLeft > 0) {
        --gDopplerPrintsLeft;
        fdfTrace("getDopplerFromSlantRangeDist this->getSensorId() = %d\nCSAR_SENSOR_JERS1_ID = %d\n", getSensorId(),
                 CSAR_SENSOR_JERS1_ID);
    }
    if (!mUseDopplerFlag) return 0.0;  // Doppler use switched off, or no usable model
    const double dR = theSlantRange - mNearSlantRange;
    if (thePerPixel && !mRangeDopplerFref.empty()) {
        const int n = static_cast<int>(mRangeDopplerFref.size());
        const int i = std::clamp(static_cast<int>(dR / mRangePixelSpacing), 0, n - 1);
        return mRangeDopplerFref[i] * mRangeDopplerFrefScale;
    }
    if ((theUseTable || mDopplerTableEstimated) && mDopplerTableFlag && mDopplerTableRows > 0) {
        // Row position in table time; the polynomials of the two neighbouring rows are blended.
        const double t = theLine * mNumberOfAzimuthLooks / prf + mDopplerTableImageOffset;
        const double aPos = mDopplerTableTimeSpan > 0.0 ? std::max(t / mDopplerTableTimeSpan, 0.0) : 0.0;
        const int aCount = mDopplerTableCols - 2;
        const int r = static_cast<int>(aPos);
        if (r >= mDopplerTableRows - 1) return polynomial(&mDopplerTable[mDopplerTableRows - 1][2], aCount, theSlantRange);
        const double f = aPos - r;
        return (1.0 - f) * polynomial(&mDopplerTable[r][2], aCount, theSlantRange) +
               f * polynomial(&mDopplerTable[r + 1][2], aCount, theSlantRange);
    }
    const double* c = mDopplerCoeff.data();
    const double tau = dR * kTwoOverC;
    const int p = mOriginProductTypeId;
    switch (mSensorId) {
    case CSAR_SENSOR_RADARSAT1_ID:
        return polynomial(c, 4, tau);
    case CSAR_SENSOR_ERS1_ID:
    case CSAR_SENSOR_ERS2_ID:
        return p == CQORV_ORIG_PROD_ENVISAT_ERS_SLC_ID ? polynomial(c, 5, tau) : c[0];
    case CSAR_SENSOR_JERS1_ID: {
        const double aPixel = dR * mNumberOfRangeLooks / mRangePixelSpacing;
        const double v = polynomial(c, 3, aPixel);
        if (aPixel >= 2001.0 && aPixel <= 2009.0)
            fdfTrace("this->mDopplerCoeff[0] = %f\nthis->mDopplerCoeff[1] = %f\naDoppVal = %f\n", c[0], c[1], v);
        return v;
    }
    case CSAR_SENSOR_ENVISAT1_ID:
    case CSAR_SENSOR_RADARSAT2_ID:
        return polynomial(c, 5, tau);
    case CSAR_SENSOR_ALOS_PALSAR_ID: {
        if (p == CQORV_ORIG_PROD_ALOS_PALSAR_KC_SCANSAR_ID) {
            // Coefficients move along azimuth with the block index, clamped to the last block.
            const double l = c[10] != 0.0 ? std::min(theLine * mNumberOfAzimuthLooks / c[10], c[11] - 1.0) : 0.0;
            const double k[5] = {c[0] + l * c[5], c[1] + l * c[6], c[2] + l * c[7], c[3] + l * c[8], c[4] + l * c[9]};
            return polynomial(k, 5, theSlantRange * 0.001);
        }
        if (p == CQORV_ORIG_PROD_ALOS_PALSAR_KC_STRIPMAP_ID) return theSlantRange * 0.001 * c[1] + c[0];
        if (p >= CQORV_ORIG_PROD_ALOS_PALSAR_GRID_MGA_PLR_ID && p <= CQORV_ORIG_PROD_ALOS_PALSAR_GRID_MGO_FBS_ID)
            return polynomial(c, 4, dR);
        return polynomial(c, 3, dR * mNumberOfRangeLooks / mRangePixelSpacing);
    }
    default:
        return c[0];
    }
}

double YDF_SAR::getDopplerFromPixel(double thePixel, double theLine, bool theUseTable, bool thePerPixel)
{
    return getDopplerFromSlantRangeDist(slantRangeOfPixel(thePixel), theLine, theUseTable, thePerPixel);
}

void YDF_SAR::print(std::ostream& o) const
{
    o << "\nYDF_SAR - START\n\n";
    o << "mNumberColsSlantRange = " << mNumberColsSlantRange << "\n";
    o << "mRangePixelShift = " << mRangePixelShift << "\n";
    o << "ncol = " << ncol << "\n";
    o << "nrow = " << nrow << "\n";
    o << "cbeg = " << cbeg << "\n";
    o << "cend = " << cend << "\n";
    o << "lbeg = " << lbeg << "\n";
    o << "lend = " << lend << "\n";
    o << "scol = " << scol << "\n";
    o << "srow = " << srow << "\n";
    o << "centerlat = " << centerlat << "\n";
    o << "centerlon = " << centerlon << "\n";
    o << "units = " << units << "\n";
    o << "time_start = " << time_start << "\n";
    o << "prf = " << prf << "\n";
    o << "mNumberOfAzimuthLooks = " << mNumberOfAzimuthLooks << "\n";
    o << "bore = " << bore << "\n";
    o << "dem_resamp = " << dem_resamp << "\n";
    o << "\nYDF_SAR - END\n\n";
}

bool fqorvGetOtherInfo(const CDescriptionHeader& theHeader, const char* theKey, std::string& theValue)
{
    return fqorvGetUserKey(theHeader, theKey, theValue);
}

int read_image_info(const CDescriptionHeader& h, YDF_SAR& sar)
{
    fdfTrace("read_image_info(");
    resetRecord(sar);
    sar.mSensorId = fqorvSensorStrToID(h["Sensor.SensorName"].getString());
    readImagePosition(h, sar);
    readRasterFacts(h, sar);
    readStartTime(h, sar);
    readRadarAndGeometry(h, sar);
    readNearRange(h, sar);
    readDopplerModel(h, sar);
    readRangeConversion(h, sar);
    if (setField(h, "Baseline.Phc")) fdfTrace("Phc = %f\n", h["Baseline.Phc"].getDouble());
    readCalibration(h, sar);
    readAntennaTables(h, sar);
    if (setField(h, "ChannelInfo.Description") == nullptr) QORV_WARNING(CQORV_ERR_UNKNOWN_KEY, "ChannelInfo.Description");
    sar.mDisplayLimits = {-25.0, 32.0, 2.0, 0.0, 0.0, 0.0};
    fdfTrace(") - START \n ");
    return 0;
}

int read_image_info(const char* aFileName, YDF_SAR& sar)
{
    CDescriptionHeader aHeader(std::vector<std::string>(kReverseSections, kReverseSections + CQORV_ALL_SECTIONS_NBR));
    const std::string aName = headerFileName(aFileName == nullptr ? "" : aFileName, true);
    if (readHeaderByName(aHeader, aFileName == nullptr ? "" : aFileName, true).empty())
        QORV_FATAL(CQORV_ERR_MISSING_FILE, ("Error: missing parameter file " + aName).c_str());
    return read_image_info(aHeader, sar);
}
