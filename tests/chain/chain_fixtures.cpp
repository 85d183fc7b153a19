#include "chain_fixtures.h"

#include <cstdint>
#include <memory>

#include "qorv_description_section.h"
#include "qorv_raster_file.h"

namespace qtest {

namespace {

void putBigEndian(std::vector<uint8_t>& theBytes, std::size_t thePos, uint32_t theValue, int theBytesNbr)
{
    for (int i = 0; i < theBytesNbr; ++i)
        theBytes[thePos + static_cast<std::size_t>(i)] = static_cast<uint8_t>(theValue >> (8 * (theBytesNbr - 1 - i)));
}

void setVector(CDescriptionHeader& theHeader, const char* theKey, std::vector<double> theValues)
{
    CDescriptionField& f = theHeader[theKey];
    f.resize(1, static_cast<int>(theValues.size()));
    for (std::size_t i = 0; i < theValues.size(); ++i) f.setValue(static_cast<int>(i), theValues[i]);
}

}  // namespace

void writeSmallRawProduct(const std::filesystem::path& theRaw, const SmallRawOptions& o)
{
    std::unique_ptr<CDescriptionHeader> h = CDescriptionHeader::makeFull();
    CDescriptionHeader& aHeader = *h;
    aHeader["Sensor.SensorName"].setValue(o.mSensor.c_str());
    aHeader["Sensor.Spectrum"].setValue("NORMAL");
    aHeader["Sensor.Baseband"].setValue("YES");
    aHeader["Sensor.Chirp"].setValue("UP_CHIRP");
    aHeader["Sensor.SamplingMode"].setValue("IQ");
    CDescriptionField& aDescription = aHeader["ChannelInfo.Description"];
    aDescription.resize(1, 1);
    aDescription.setValue(0, "VV");
    setVector(aHeader, "ChannelInfo.CarrierFrequency", {5.3e9});
    setVector(aHeader, "ChannelInfo.SamplingRate", {18.96e6});
    // A pulse that fits the short echo window of 64 samples (3.4 us).
    setVector(aHeader, "ChannelInfo.PulseDuration", {2.0e-6});
    setVector(aHeader, "ChannelInfo.BandWidth", {15.55e6});
    setVector(aHeader, "ChannelInfo.PRF", {1600.0});
    setVector(aHeader, "ChannelInfo.PRFExtracted", {1679.9});
    aHeader["ChannelInfo.IncidenceAngle"].setValue(23.0);
    aHeader["RasterInfo.NrOfPixelsPerLine"].setValue(o.mPixels);
    aHeader["RasterInfo.NrOfLinesPerImage"].setValue(o.mLines);
    aHeader["RasterInfo.CellType"].setValue("UBYTE_COMPLEX");
    aHeader["RasterInfo.BytesOrder"].setValue("MSBF");
    aHeader["RasterInfo.HeaderOffset"].setValue(0);
    aHeader["RasterInfo.RowPrefix"].setValue(412);
    aHeader["RasterInfo.RowSuffix"].setValue(0);
    aHeader["RasterInfo.NullCellValue"].setValue(-9999.0);
    setVector(aHeader, "Processing.SlantRange", {841302.86});
    setVector(aHeader, "Processing.FastTime", {2.0 * 841302.86 / 299792458.0});
    aHeader["Processing.PixelSpacingRg"].setValue(299792458.0 / (2.0 * 18.96e6));
    if (o.mWithVelocity) setVector(aHeader, "Processing.ProcessingVelocity", {7109.5});
    aHeader["InitialGeometry.Projection"].setValue("SLANT_RANGE");
    aHeader["sar_processing.FirstPixel"].setValue(0);
    if (!aHeader.write((theRaw.string() + ".sml").c_str(), true, false)) throw std::runtime_error("header write");

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(aHeader, theRaw.c_str(), aParam);
    CRasterFile aRaster;
    aRaster.openWrite(CQORV_RF_OPEN_WRITE, aParam);
    std::vector<uint8_t> aPrefix(412, 0);
    std::vector<uint8_t> aLine(static_cast<std::size_t>(2 * o.mPixels), 15);
    for (int i = 0; i < o.mLines; ++i) {
        const int aCode = (o.mChangeLine >= 0 && i >= o.mChangeLine) ? o.mChangedCode : o.mPriCode;
        putBigEndian(aPrefix, 60, static_cast<uint32_t>(aCode), 2);
        putBigEndian(aPrefix, 210, static_cast<uint32_t>(1000 + i), 4);
        putBigEndian(aPrefix, 214, 1209, 2);
        aRaster.setRowPrefix(aPrefix.data());
        aRaster.writeLines(i, 1, aLine.data());
    }
    aRaster.close();
}

}  // namespace qtest
