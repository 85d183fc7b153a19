#include "store_test_util.h"

#include <cmath>

namespace storetest {

void fillTestSection(CDescriptionHeader& h)
{
    h["StoreTest.IntScalar"].setValue(-42);
    h["StoreTest.DblScalar"].setValue(1679.9);
    h["StoreTest.StrScalar"].setValue("a&b <c> \"d\" 'e'");
    h["StoreTest.IntVector"].resize(1, 3);
    for (int i = 0; i < 3; ++i) h["StoreTest.IntVector"].setValue(i, 2147483647 - i);
    h["StoreTest.DblVector"].resize(1, 4);
    h["StoreTest.DblVector"].setValue(0, 0.1);
    h["StoreTest.DblVector"].setValue(1, std::nan(""));
    h["StoreTest.DblVector"].setValue(2, -3.712e-05);
    h["StoreTest.DblVector"].setValue(3, 5.3e9);
    h["StoreTest.StrVector"].resize(1, 2);
    h["StoreTest.StrVector"].setValue(0, "HH");  // element 1 stays unset
    h["StoreTest.IntMatrix"].resize(2, 2);
    for (int r = 0; r < 2; ++r)
        for (int c = 0; c < 2; ++c) h["StoreTest.IntMatrix"].setValue(r, c, 10 * r + c);
    h["StoreTest.DblMatrix"].resize(1, 3);
    h["StoreTest.DblMatrix"].setValue(0, 0, 9591.0);
    h["StoreTest.DblMatrix"].setValue(0, 1, 35000.5);
    h["StoreTest.DblMatrix"].setValue(0, 2, 310.0);
    h["StoreTest.StrMatrix"].resize(1, 2);
    h["StoreTest.StrMatrix"].setValue(0, 0, "ORIGIN DATA");
    h["StoreTest.StrMatrix"].setValue(0, 1, "ers_raw");
    h["StoreTest.PairA"].setValue(1.5);
    h["StoreTest.PairB"].setValue(-2.25);
    h["StoreTest.Track"].resize(1, 2);
    for (int i = 0; i < 2; ++i) {
        h["StoreTest.TrackT"].setValue(i, 0.5 * i);
        h["StoreTest.TrackV"].setValue(i, 7100.0 + i);
    }
}

}  // namespace storetest

namespace storetest {

void fillErsExample(CDescriptionHeader& h)
{
    const double c = 299792458.0;
    const double fs = 18.96e6, prf = 1679.902394, near = 841302.8636;
    const double dr = c / (2.0 * fs);
    const int pixels = 5616, lines = 28000;
    h["RegistrationCoordinates.LatNorthing"].setValue(41.8);
    h["RegistrationCoordinates.LonEasting"].setValue(12.6);
    h["AcquisitionParameters.AzimuthStartTime"].setValue("15-MAR-1997 09:41:26.189159");
    h["AcquisitionParameters.AzimuthStopTime"].setValue("15-MAR-1997 09:41:42.856795");
    const auto one = [&h](const char* theKey, double theValue) {
        h[theKey].resize(1, 1);
        h[theKey].setValue(0, theValue);
    };
    h["ChannelInfo.Description"].resize(1, 1);
    h["ChannelInfo.Description"].setValue(0, "VV");
    one("ChannelInfo.CarrierFrequency", 5.3e9);
    one("ChannelInfo.SamplingRate", fs);
    one("ChannelInfo.PulseDuration", 37.12e-6);
    one("ChannelInfo.BandWidth", 15.55e6);
    one("ChannelInfo.PRF", prf);
    one("ChannelInfo.PRFExtracted", prf);
    h["ChannelInfo.IncidenceAngle"].setValue(23.0);
    h["Sensor.SensorName"].setValue("ERS-2");
    h["Sensor.Spectrum"].setValue("NORMAL");
    h["Sensor.Baseband"].setValue("YES");
    h["Sensor.Chirp"].setValue("UP_CHIRP");
    h["Sensor.SamplingMode"].setValue("IQ");
    h["Sensor.AzimuthAngle"].setValue(90.0);
    h["sar_processing.FirstPixel"].setValue(0);
    h["RasterInfo.NrOfPixelsPerLine"].setValue(pixels);
    h["RasterInfo.NrOfLinesPerImage"].setValue(lines);
    h["RasterInfo.CellType"].setValue("UBYTE_COMPLEX");
    h["RasterInfo.DataUnits"].setValue("ERS RAW");
    h["RasterInfo.BytesOrder"].setValue("MSBF");
    h["RasterInfo.HeaderOffset"].setValue(11644);
    h["RasterInfo.RowPrefix"].setValue(412);
    h["RasterInfo.RowSuffix"].setValue(0);
    h["RasterInfo.FooterLen"].setValue(0);
    h["RasterInfo.NullCellValue"].setValue(-9999.0);
    h["RasterInfo.GeocodedImage"].setValue("NotOK");
    fqorvSetUserKey(h, "ORIGIN DATA", "ers_raw");
    const double ranges[3] = {near, near + 0.5 * (pixels - 1) * dr, near + (pixels - 1) * dr};
    h["Processing.SlantRange"].resize(1, 3);
    h["Processing.FastTime"].resize(1, 3);
    for (int i = 0; i < 3; ++i) {
        h["Processing.SlantRange"].setValue(i, ranges[i]);
        h["Processing.FastTime"].setValue(i, 2.0 * ranges[i] / c);
    }
    h["Processing.PixelSpacingRg"].setValue(dr);
    h["Processing.PixelSpacingAz"].setValue(3.98);
    h["Processing.NRangeLooks"].setValue(1);
    h["Processing.NAzimuthLooks"].setValue(1);
    one("Processing.ProcessingVelocity", 7109.5);
    h["InitialGeometry.Projection"].setValue("SLANT_RANGE");
    h["InitialGeometry.TimeDirectionLines"].setValue("INCREASE TIME DIRECTION");
    h["InitialGeometry.TimeDirectionPixel"].setValue("INCREASE TIME DIRECTION");
    h["InitialGeometry.ReferenceHeight"].setValue(0.0);
    // Nine Earth-fixed state vectors, 15 s apart, around the acquisition.
    const double pos[3][9] = {
        {4868583.668, 4950005.570, 5030209.226, 5109173.944, 5186879.349, 5263305.381, 5338432.306, 5412240.720, 5484711.552},
        {1513449.896, 1508449.911, 1502905.408, 1496820.440, 1490199.237, 1483046.205, 1475365.923, 1467163.141, 1458442.780},
        {5017973.352, 4939336.306, 4859489.238, 4778451.757, 4696243.760, 4612885.432, 4528397.238, 4442799.918, 4356114.484}};
    const double vel[3][9] = {
        {5468.270, 5387.750, 5305.841, 5222.562, 5137.936, 5051.983, 4964.725, 4876.185, 4786.385},
        {-315.095, -351.527, -387.695, -423.587, -459.191, -494.496, -529.489, -564.160, -598.498},
        {-5201.705, -5283.020, -5363.038, -5441.739, -5519.103, -5595.113, -5669.749, -5742.993, -5814.828}};
    h["StateVectorData.nStateVectors"].setValue(9);
    h["StateVectorData.StateVectorReference"].setValue("ECR");
    h["StateVectorData.TimeFirst"].setValue("15-MAR-1997 09:40:27.000000");
    h["StateVectorData.TimeDelta"].setValue(15.0);
    const char* names[6] = {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z",
                            "StateVectorData.vel_x", "StateVectorData.vel_y", "StateVectorData.vel_z"};
    for (int k = 0; k < 6; ++k) {
        h[names[k]].resize(1, 9);
        for (int i = 0; i < 9; ++i) h[names[k]].setValue(i, k < 3 ? pos[k][i] : vel[k - 3][i]);
    }
}

}  // namespace storetest
