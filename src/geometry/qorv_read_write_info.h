// The description of one SAR image as the geometry code and the azimuth steps use it: YDF_SAR,
// filled from the image's header by read_image_info, with the Doppler centroid model.
#pragma once

#include <array>
#include <ostream>
#include <string>
#include <vector>

class CDescriptionHeader;

/// One SAR image: sizes, timing, radar, range geometry, Doppler model, calibration, antenna.
struct YDF_SAR {
    YDF_SAR();

    /// Sensor id of "Sensor.SensorName" (CSAR_SENSOR_*_ID).
    int getSensorId() const { return mSensorId; }

    /// Doppler centroid (Hz) at slant range theSlantRange (m) and image line theLine. Precedence:
    /// the per-pixel array (thePerPixel), the Doppler table (rows blended by line time, polynomial
    /// in slant range in metres; the estimator's table always, a product's own table with
    /// theUseTable), the sensor's polynomial. 0 when mUseDopplerFlag is false.
    double getDopplerFromSlantRangeDist(double theSlantRange, double theLine, bool theUseTable, bool thePerPixel);
    /// The same at a pixel: slant range = near range + thePixel * range pixel spacing.
    double getDopplerFromPixel(double thePixel, double theLine, bool theUseTable, bool thePerPixel);
    /// Slant range (m) of a pixel of this image.
    double slantRangeOfPixel(double thePixel) const { return mNearSlantRange + thePixel * mRangePixelSpacing; }

    /// The record dump between "\nYDF_SAR - START\n\n" and "\nYDF_SAR - END\n\n".
    void print(std::ostream& theOut) const;

    int mOrigAzStart = 0;
    int aColStart = 0;
    int mOriginProductTypeId = -1;
    int mNumberColsSlantRange = 0;
    int mNumberCols = 0;  // copy of ncol
    int ncol = 0, nrow = 0;
    int cbeg = 0, cend = 0, lbeg = 0, lend = 0;
    int scol = 0, srow = 0;
    double centerlat = 0.0, centerlon = 0.0;
    std::string units;
    double time_start = 0.0;  // s of the day of the first line
    int mStartDay = 0;        // day number (days since 1970-01-01) of time_start
    double prf = 0.0;
    double mNumberOfAzimuthLooks = 1.0;
    double mNumberOfRangeLooks = 1.0;
    double bore = 0.0;
    double dem_resamp = 0.0;
    double kpro = 1.0;
    double mReplicaPower = 0.0;
    int mSensorId = -1;
    double lam = 0.0;   // wavelength, m
    double lam2 = 0.0;  // 2 / lam
    int mBlockSize1 = 2500, mBlockSize2 = 50;
    bool mLineIncrease = true;
    bool mPixelIncrease = true;
    bool mAscending = true;
    double mSceneHeading = 344.0;  // degrees
    bool mRightLooking = true;
    double mid_incid = -1.0;       // radians
    double mFourPiOverLambda = 0.0;
    double mNearSlantRange = 0.0;        // m, as read
    double mNearSlantRangeConv = 0.0;    // m, what the ground/slant conversion works on
    double mNearSlantRangeGround = 0.0;  // m, what the ground-range branch leaves
    double mRangePixelShift = 0.0;
    double mAzimuthPixelSpacing = 0.0;
    double mRangePixelSpacing = 0.0;
    double mDopplerRefTime = 0.0;
    double mFastTime = 0.0;
    bool mUseDopplerFlag = true;
    std::array<double, 16> mDopplerCoeff{};
    bool mDopplerTableFlag = false;
    bool mDopplerTableEstimated = false;  // the table is the Doppler estimator's: used whatever the table flag of a call
    int mDopplerTableRows = 0, mDopplerTableCols = 0;
    std::vector<std::vector<double>> mDopplerTable;  // day, seconds of day, coefficients lowest first
    std::vector<double> mBetaNoughtCoeff;
    int mBetaNoughtNbr = 0;
    std::vector<double> mRangeDopplerFref;  // Hz per pixel
    int mRangeDopplerFrefSize = 0;
    double mRangeDopplerFrefScale = 1.0;
    double mDopplerTableTimeSpan = 0.0;     // s between the first two table rows
    double mDopplerTableImageOffset = 0.0;  // s from the first table row to the image start
    int mSARMode = 1;                       // 0 spotlight, 1 stripmap, 2 ScanSAR
    double mSlantRangeRef = -1.0, mSlantRangeExp = -1.0;
    // Conversion tables (16 slots; the sixteenth is the reference distance).
    std::array<double, 16> mSlantDistToImagePosition{}, mImagePositionToSlantDist{};
    std::array<double, 16> mGroundToSlantPosition{}, mSlantToGroundPosition{};
    int mSlantDistToImagePositionNbr = 0, mImagePositionToSlantDistNbr = 0;
    int mGroundToSlantPositionNbr = 0, mSlantToGroundPositionNbr = 0;
    int mRangeScaleFactor = 1;
    float mUnwrappingThreshold = -1.0f;
    float mNullValue = -9999.0f, mNullValue2 = -9999.0f;
    float mCos35 = 0.0f;
    int mHeaderOffset = 0, mRowPrefix = 0, mCellType = -1, mDataUnits = -1;
    double mSlantPixelSpacing = 0.0;
    double mRescalingMin = -9999.0, mRescalingScale = -9999.0;
    int mAntennaTableNbr = 0;
    std::vector<double> mAntennaTable;
    double mAntennaIncrement = 0.1;
    double mAntennaCentre = 0.0;
    std::string mBeamName;
    int mScanSarSampleNbr = 0;
    std::vector<double> mScanSarTable;
    std::array<double, 6> mDisplayLimits{};
    bool mEnvisatDoppCorr = false;  // "Processing.ProcessingType" is "ENVISAT_DOPP_CORR"
    bool mGroundRange = false;
};

/// Fills sar from the header of aFileName (a raster or header name: "_hdr" is appended unless it
/// ends in "_orb_hdr", "_hdr" or "_orb.sml"; the ".sml" of the name is found as well). Returns 0;
/// failures end the process (261122 missing header, 261121 bad per-pixel Doppler size or ground
/// range without conversion tables, 130560 for ground-range precise tables not supported).
int read_image_info(const char* aFileName, YDF_SAR& sar);
/// The same from a header already in memory.
int read_image_info(const CDescriptionHeader& theHeader, YDF_SAR& sar);

/// The value text of a user key of "RasterInfo.OtherInfo" (rows scanned in order, compared over
/// the key's length); false when absent.
bool fqorvGetOtherInfo(const CDescriptionHeader& theHeader, const char* theKey, std::string& theValue);
