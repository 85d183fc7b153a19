#include "qorv_sim_header.h"

#include <string>

namespace {

constexpr double CQORV_SIM_LIGHT = 299792458.0;

void setVector(CDescriptionHeader& h, const char* theKey, const std::vector<double>& theValues)
{
    CDescriptionField& f = h[theKey];
    f.resize(1, static_cast<int>(theValues.size()));
    for (std::size_t i = 0; i < theValues.size(); ++i) f.setValue(static_cast<int>(i), theValues[i]);
}

void setText(CDescriptionHeader& h, const char* theKey, const std::string& theValue)
{
    h[theKey].setValue(theValue.c_str());
}

void fillChannel(CDescriptionHeader& h, const CSimScene& s, const CSimSceneTruth& t)
{
    const CSimRadar& r = s.mRadar;
    CDescriptionField& d = h["ChannelInfo.Description"];
    d.resize(1, 1);
    d.setValue(0, r.mPolarisation.c_str());
    setVector(h, "ChannelInfo.CarrierFrequency", {r.mCarrier});
    setVector(h, "ChannelInfo.SamplingRate", {r.mSamplingRate});
    setVector(h, "ChannelInfo.PulseDuration", {r.mPulseLength});
    setVector(h, "ChannelInfo.BandWidth", {r.mBandwidth});
    setVector(h, "ChannelInfo.PRF", {r.mPrf});
    // The PRF scan copies PRFExtracted into PRF for every sensor but ENVISAT-1, which it skips.
    if (r.mSensorName != "ENVISAT-1") setVector(h, "ChannelInfo.PRFExtracted", {r.mPrf});
    h["ChannelInfo.IncidenceAngle"].setValue(t.mIncidenceDeg);
    h["ChannelInfo.RangeLookAngle"].setValue(t.mLookAngleDeg);

    setText(h, "Sensor.SensorName", r.mSensorName);
    setText(h, "Sensor.Spectrum", "NORMAL");
    setText(h, "Sensor.Baseband", "YES");
    setText(h, "Sensor.Chirp", r.mUpChirp ? "UP_CHIRP" : "DOWN_CHIRP");
    setText(h, "Sensor.SamplingMode", "IQ");
    setText(h, "Sensor.SARMode", "STRIPMAP");
    h["Sensor.AzimuthAngle"].setValue(s.mLookSign > 0 ? 90.0 : -90.0);
}

void fillRaster(CDescriptionHeader& h, const CSimScene& s, const CSimTimeline& tl)
{
    h["sar_processing.FirstPixel"].setValue(0);
    h["RasterInfo.NrOfPixelsPerLine"].setValue(s.mSamples);
    h["RasterInfo.NrOfLinesPerImage"].setValue(static_cast<int>(tl.records().size()));
    setText(h, "RasterInfo.CellType", s.cellTypeName());
    if (!s.mDataUnits.empty()) setText(h, "RasterInfo.DataUnits", s.mDataUnits);
    setText(h, "RasterInfo.BytesOrder", "MSBF");
    h["RasterInfo.HeaderOffset"].setValue(static_cast<int>(s.mHeaderOffset));
    h["RasterInfo.RowPrefix"].setValue(s.mPrefix.mSize);
    h["RasterInfo.RowSuffix"].setValue(0);
    h["RasterInfo.FooterLen"].setValue(0);
    h["RasterInfo.NullCellValue"].setValue(-9999.0);
    setText(h, "RasterInfo.GeocodedImage", "NotOK");
    if (!s.mOriginData.empty()) fqorvSetUserKey(h, "ORIGIN DATA", s.mOriginData.c_str());
    fqorvSetUserKey(h, "SIMULATOR", "qorvex_simulate 1.0");
}

void fillProcessing(CDescriptionHeader& h, const CSimScene& s, const CSimSceneTruth& t)
{
    const double dr = s.mRadar.rangeSpacing();
    const double aNear = t.mNearRange;
    const double aCentre = aNear + 0.5 * s.mSamples * dr;
    const double aFar = aNear + (s.mSamples - 1) * dr;
    setVector(h, "Processing.SlantRange", {aNear, aCentre, aFar});
    setVector(h, "Processing.FastTime", {2.0 * aNear / CQORV_SIM_LIGHT, 2.0 * aCentre / CQORV_SIM_LIGHT,
                                         2.0 * aFar / CQORV_SIM_LIGHT});
    h["Processing.PixelSpacingRg"].setValue(dr);
    h["Processing.PixelSpacingAz"].setValue(t.mGroundVelocity / s.mRadar.mPrf);
    h["Processing.NRangeLooks"].setValue(1);
    h["Processing.NAzimuthLooks"].setValue(1);
    setVector(h, "Processing.ProcessingVelocity", {t.mProcessingVelocity * (1.0 + s.mHeaderVelocityError)});
    if (s.mWriteDoppler) {
        // The imported form: one row, the constant term of the polynomial in range.
        CDescriptionField& f = h["Processing.DopCenRangeCoeff"];
        f.resize(1, 1);
        f.setValue(0, 0, s.mDopplerCentroid);
    }
}

void fillGeometry(CDescriptionHeader& h, const CSimScene& s, const CSimTimeline& tl, const CSimOrbit& theOrbit,
                  const CSimSceneTruth& t)
{
    h["RegistrationCoordinates.LatNorthing"].setValue(t.mCentreLat);
    h["RegistrationCoordinates.LonEasting"].setValue(t.mCentreLon);
    setText(h, "AcquisitionParameters.AzimuthStartTime", fqorvSimHeaderDate(s.mEpoch.plus(tl.pulseTime(0))));
    setText(h, "AcquisitionParameters.AzimuthStopTime", fqorvSimHeaderDate(s.mEpoch.plus(tl.pulseTime(s.mPulses - 1))));

    setText(h, "InitialGeometry.Projection", "SLANT_RANGE");
    setText(h, "InitialGeometry.TimeDirectionLines", "INCREASE TIME DIRECTION");
    setText(h, "InitialGeometry.TimeDirectionPixel", "INCREASE TIME DIRECTION");
    const double aHeading = t.mHeadingDeg;
    setText(h, "InitialGeometry.OrbitConfiguration", (aHeading > 270.0 || aHeading < 90.0) ? "ASCENDING" : "DESCENDING");
    h["InitialGeometry.SceneHeading"].setValue(aHeading);
    h["InitialGeometry.ReferenceHeight"].setValue(s.mCentreHeight);

    const CSimStateVectors v = fqorvSimStateVectors(s, theOrbit, tl);
    const int n = static_cast<int>(v.mStates.size());
    h["StateVectorData.nStateVectors"].setValue(n);
    setText(h, "StateVectorData.StateVectorReference", "ECR");
    setText(h, "StateVectorData.TimeFirst", fqorvSimHeaderDate(s.mEpoch.plus(v.mFirst)));
    h["StateVectorData.TimeDelta"].setValue(v.mStep);
    const char* const aKeys[6] = {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z",
                                  "StateVectorData.vel_x", "StateVectorData.vel_y", "StateVectorData.vel_z"};
    for (int c = 0; c < 6; ++c) {
        std::vector<double> aValues;
        for (const CSimState& st : v.mStates) {
            const CSimVec3& p = c < 3 ? st.mPos : st.mVel;
            aValues.push_back(c % 3 == 0 ? p.x : (c % 3 == 1 ? p.y : p.z));
        }
        setVector(h, aKeys[c], aValues);
    }
}

}  // namespace

void fqorvSimFillHeader(CDescriptionHeader& theHeader, const CSimScene& theScene, const CSimTimeline& theTimeline,
                        const CSimOrbit& theOrbit, const CSimSceneTruth& theTruth)
{
    fillChannel(theHeader, theScene, theTruth);
    fillRaster(theHeader, theScene, theTimeline);
    fillProcessing(theHeader, theScene, theTruth);
    fillGeometry(theHeader, theScene, theTimeline, theOrbit, theTruth);
}
