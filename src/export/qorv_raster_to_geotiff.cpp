#include "qorv_raster_to_geotiff.h"

#include <geo_normalize.h>
#include <geotiff.h>
#include <geotiffio.h>
#include <tiffio.h>
#include <xtiffio.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "qorv_raster_utility.h"
#include "tools_raster_file_exp.h"

namespace {

/// What the step's arguments say.
struct CTiffArguments {
    std::string mInput, mOutput, mTitle;
    double mSaturation = 1.0 / 3.0;
    int mRowWin = -1, mColWin = -1;
    double mScaleIn = 1.0, mExponent = 1.0;
    bool mColsInvert = false, mRowsInvert = false;
};

CTiffArguments readArguments(int argc, char** argv)
{
    fdfTrace("\n  geotiff conversion\n");
    if (argc < 3 || argv[1] == nullptr || argv[2] == nullptr)
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, "geotiff conversion: input and output file names are needed");
    CTiffArguments a;
    a.mTitle = argv[0] ? argv[0] : "";
    a.mInput = argv[1];
    a.mOutput = argv[2];
    if (argc > 3) a.mSaturation = std::atof(argv[3]);
    if (argc > 4) std::sscanf(argv[4], "%d", &a.mRowWin);
    if (argc > 5) std::sscanf(argv[5], "%d", &a.mColWin);
    if (argc > 6) std::sscanf(argv[6], "%lf", &a.mScaleIn);
    if (argc > 7) std::sscanf(argv[7], "%lf", &a.mExponent);
    if (argc > 9) a.mColsInvert = std::strncmp(argv[9], "OK", 2) == 0;
    if (argc > 10) a.mRowsInvert = std::strncmp(argv[10], "OK", 2) == 0;
    return a;
}

std::string textOr(const CDescriptionHeader& h, const char* theKey, const char* theDefault)
{
    return fqorvHasValue(h, theKey) ? h[theKey].getString() : theDefault;
}

double doubleOr(const CDescriptionHeader& h, const char* theKey, double theDefault)
{
    return fqorvHasValue(h, theKey) ? h[theKey].getDouble() : theDefault;
}

/// The GeoTIFF keys of a geocoded header's cartographic state.
void setUpGeoKeys(GTIF* theGtif, const CDescriptionHeader& h)
{
    if (!fqorvHasValue(h, "CartographicSystem.State")) {
        fdfTrace("\nSetUpGeoKeys No State Spec");
        return;
    }
    const std::string aState = h["CartographicSystem.State"].getString();
    if (aState == "GEO-GLOBAL") {
        GTIFKeySet(theGtif, GTCitationGeoKey, TYPE_ASCII, 0, "Geographic Model WGS 84");
        GTIFKeySet(theGtif, GTModelTypeGeoKey, TYPE_SHORT, 1, ModelGeographic);
        GTIFKeySet(theGtif, GTRasterTypeGeoKey, TYPE_SHORT, 1, RasterPixelIsArea);
        GTIFKeySet(theGtif, GeogAngularUnitsGeoKey, TYPE_SHORT, 1, 9102);
        GTIFKeySet(theGtif, GeogAngularUnitSizeGeoKey, TYPE_DOUBLE, 1, M_PI / 180.0);
        GTIFKeySet(theGtif, GeogCitationGeoKey, TYPE_ASCII, 0, "WGS 84 Ellipsoid Used");
        GTIFKeySet(theGtif, GeographicTypeGeoKey, TYPE_SHORT, 1, 4326);
        GTIFKeySet(theGtif, GeogGeodeticDatumGeoKey, TYPE_SHORT, 1, 6326);
        GTIFKeySet(theGtif, GeogEllipsoidGeoKey, TYPE_SHORT, 1, 7030);
        GTIFKeySet(theGtif, GeogPrimeMeridianGeoKey, TYPE_SHORT, 1, 8901);
    } else if (aState == "UTM-GLOBAL") {
        const int aZone = fqorvHasValue(h, "CartographicSystem.Zone") ? h["CartographicSystem.Zone"].getInteger() : 0;
        const std::string aHemi = textOr(h, "CartographicSystem.Hemisphere", "NORTH");
        const int aCode = (aHemi == "NORTH" ? 32600 : 32700) + aZone;
        const char* aLetter = aHemi == "NORTH" ? "N" : "S";
        GTIFKeySet(theGtif, GTModelTypeGeoKey, TYPE_SHORT, 1, ModelProjected);
        GTIFKeySet(theGtif, GTRasterTypeGeoKey, TYPE_SHORT, 1, RasterPixelIsArea);
        GTIFKeySet(theGtif, GTCitationGeoKey, TYPE_ASCII, 0, fqorvStringFormat("UTM Zone %d%s WGS84", aZone, aLetter).c_str());
        GTIFKeySet(theGtif, PCSCitationGeoKey, TYPE_ASCII, 0,
                   fqorvStringFormat("UTM Zone %d%s  with WGS84", aZone, aLetter).c_str());
        GTIFKeySet(theGtif, ProjectedCSTypeGeoKey, TYPE_SHORT, 1, aCode);
        GTIFKeySet(theGtif, ProjLinearUnitsGeoKey, TYPE_SHORT, 1, 9001);
        GTIFKeySet(theGtif, ProjLinearUnitSizeGeoKey, TYPE_DOUBLE, 1, 1.0);
    } else {
        std::string aText;
        const auto add = [&](const char* theLabel, const char* theKey) {
            aText += theLabel;
            aText += textOr(h, theKey, "UNKNOW Data");
        };
        add("| State = ", "CartographicSystem.State");
        add("| Hemisphere = ", "CartographicSystem.Hemisphere");
        add("| Projection = ", "InitialGeometry.Projection");
        aText += "| Zone = ";
        aText += fqorvHasValue(h, "CartographicSystem.Zone") ? std::to_string(h["CartographicSystem.Zone"].getInteger())
                                                        : std::string("UNKNOW Data");
        add("| Ellipsoid = ", "CartographicSystem.Ellipsoid");
        add("| DatumShift = ", "CartographicSystem.DatumShift");
        GTIFKeySet(theGtif, GTCitationGeoKey, TYPE_ASCII, 0, aText.c_str());
        GTIFKeySet(theGtif, GTModelTypeGeoKey, TYPE_SHORT, 1, 32767);
    }
}

/// Tie point and pixel scale of a geocoded product.
void writeGeoTags(TIFF* theTiff, const CDescriptionHeader& h, const CTiffWindow& w)
{
    double aRowScale = doubleOr(h, "RegistrationCoordinates.PixelSpacingLatNorth", 1.0);
    double aColScale = doubleOr(h, "RegistrationCoordinates.PixelSpacingLonEast", 1.0);
    if (aColScale == 0.0 || std::isnan(aColScale)) {
        fdfTrace("WRONG Cols Scale = %lf\n", aColScale);
        aColScale = 1.0;
    }
    aRowScale *= w.mRowWin;
    aColScale *= w.mColWin;
    const double aX = doubleOr(h, "RegistrationCoordinates.LonEasting", 0.0);
    const double aY = doubleOr(h, "RegistrationCoordinates.LatNorthing", 0.0);
    fdfTrace("aRowStart = %lf\naColStart = %lf\n", aY, aX);
    double aTie[6] = {0, 0, 0, aX, aY, 0};
    double aScale[3] = {aColScale, std::fabs(aRowScale), 0};
    TIFFSetField(theTiff, TIFFTAG_GEOTIEPOINTS, 6, aTie);
    TIFFSetField(theTiff, TIFFTAG_GEOPIXELSCALE, 3, aScale);
}

[[noreturn]] void failTiff(int theId, const std::string& theTemp, const std::string& theWords)
{
    std::remove(theTemp.c_str());
    fdfTrace("Error: %s\n", theWords.c_str());
    QORV_FATAL(theId, theWords.c_str());
}

}  // namespace

CTiffWindow fqorvTiffWindow(int theLines, int thePixels, int theRowWin, int theColWin)
{
    CTiffWindow w;
    if (theColWin < 0) {
        fdfTrace("Automatic nav\n");
        if (theLines >= thePixels) {
            while (static_cast<long long>(w.mRowWin) * thePixels < theLines) ++w.mRowWin;
        } else {
            while (static_cast<long long>(w.mColWin) * theLines < thePixels) ++w.mColWin;
        }
    } else {
        w.mRowWin = std::max(1, theRowWin);
        w.mColWin = std::max(1, theColWin);
    }
    w.mRowsOut = theLines / w.mRowWin;
    w.mColsOut = thePixels / w.mColWin;
    return w;
}

int qorv_raster_to_geotiff(int argc, char** argv)
{
    const CTiffArguments a = readArguments(argc, argv);
    const std::string aTemp = a.mOutput + ".part";

    // Header and raster.
    auto h = CDescriptionHeader::makeFull();
    const std::string aHeaderName = a.mInput + "_hdr";
    if (!h->read(aHeaderName.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, fqorvStringFormat("Error: missing parameter file %s", aHeaderName.c_str()).c_str());
    }
    const bool aGeocoded = textOr(*h, "RasterInfo.GeocodedImage", "") == "OK";
    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(*h, a.mInput.c_str(), aParam);
    fdfTrace("\nMAKE TIFF OF FILE [%s]\nTIFF  NAME  [%s%s]\n", a.mInput.c_str(), a.mOutput.c_str(), "");
    if (!fqorvFileExists(a.mInput)) QORV_FATAL(CQORV_ERR_MANDATORY, a.mInput.c_str());
    CRasterFile aFile;
    aFile.openRead(aParam);
    const int aLines = aFile.getNrOfLines(), aPixels = aFile.getNrOfPixels();
    const int aUnits = aFile.getDataUnits();
    const bool aComplex = fqorvCellTypeIsComplex(aFile.getCellType());
    fdfTrace("Data Units : %s;  Data Type : %s;  Number of Line : %d;  Number of Pixels : %d\nDummy Value Found = %lf\n",
             fqorvDataUnitsName(aUnits), fqorvCellTypeName(aFile.getCellType()), aLines, aPixels, aFile.getDummyVal());
    const CTiffWindow w = fqorvTiffWindow(aLines, aPixels, a.mRowWin, a.mColWin);
    fdfTrace("aColWinSizeange    = %d\naRowWinSizezimuth  = %d\nTIFF SIZE Row = %d X  Col = %d\n", w.mColWin, w.mRowWin,
             w.mRowsOut, w.mColsOut);
    if (w.mRowsOut < 1 || w.mColsOut < 1) QORV_FATAL(CQORV_ERR_WINDOW_TOO_SMALL, a.mInput.c_str());

    // Statistics first: an image without data fails before any output exists.
    const bool aPowerUnit = aUnits == CQORV_UNITS_POWER || aUnits == CQORV_UNITS_CALIBRATED;
    const CImageStats aStats = fqorvImageStatistics(aFile, aPowerUnit, 0, 15);
    const CStretch aStretch = fqorvMakeStretch(aUnits, aStats, a.mSaturation, a.mScaleIn, a.mExponent);
    fdfTrace("\n\nAverage input value: %lf\nMinimum input value: %lf\nMax input value: %lf\nScale: %lf\nExponent: %lf\n",
             aPowerUnit ? aStats.mMean * aStats.mMean : aStats.mMean, aStats.mMin, aStats.mMax, aStretch.mScale,
             aStretch.mExponent);

    // The TIFF, under a temporary name until it is complete.
    TIFF* aTiff = XTIFFOpen(aTemp.c_str(), "w");
    if (aTiff == nullptr) failTiff(CQORV_ERR_CREATE_FILE, aTemp, "cannot open TIFF " + a.mOutput);
    GTIF* aGtif = nullptr;
    if (aGeocoded) {
        aGtif = GTIFNew(aTiff);
        if (aGtif == nullptr) {
            XTIFFClose(aTiff);
            failTiff(CQORV_ERR_CREATE_FILE, aTemp, "GeoTIFF handle of " + a.mOutput);
        }
    }
    TIFFSetField(aTiff, TIFFTAG_IMAGEWIDTH, static_cast<uint32_t>(w.mColsOut));
    TIFFSetField(aTiff, TIFFTAG_IMAGELENGTH, static_cast<uint32_t>(w.mRowsOut));
    TIFFSetField(aTiff, TIFFTAG_ORIENTATION, ORIENTATION_TOPLEFT);
    TIFFSetField(aTiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
    TIFFSetField(aTiff, TIFFTAG_COMPRESSION, COMPRESSION_NONE);
    TIFFSetField(aTiff, TIFFTAG_SAMPLESPERPIXEL, 1);
    TIFFSetField(aTiff, TIFFTAG_BITSPERSAMPLE, 8);
    TIFFSetField(aTiff, TIFFTAG_ROWSPERSTRIP, 20);
    TIFFSetField(aTiff, TIFFTAG_SOFTWARE, a.mTitle.c_str());
    TIFFSetField(aTiff, TIFFTAG_DOCUMENTNAME, a.mOutput.c_str());
    TIFFSetField(aTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    if (aGeocoded) {
        writeGeoTags(aTiff, *h, w);
        setUpGeoKeys(aGtif, *h);
    }

    // Lines: each output row averages aRowWin input lines and aColWin columns of non-null values.
    fdfTrace(a.mColsInvert ? "Cols invert\n" : "Cols Normal\n");
    fdfTrace(a.mRowsInvert ? "Rows invert\n" : "Rows Normal\n");
    const double aNull = aFile.getDummyVal();
    std::vector<dcomplex> aLine(static_cast<std::size_t>(aPixels));
    std::vector<double> aSum(static_cast<std::size_t>(w.mColsOut));
    std::vector<int> aCount(aSum.size());
    std::vector<uint8_t> aBytes(aSum.size());
    int aPercent = 15;
    for (int o = 0; o < w.mRowsOut; ++o) {
        std::fill(aSum.begin(), aSum.end(), 0.0);
        std::fill(aCount.begin(), aCount.end(), 0);
        for (int k = 0; k < w.mRowWin; ++k) {
            const int r = o * w.mRowWin + k;
            fqorvReadLine(aFile, aLine.data(), a.mRowsInvert ? aLines - 1 - r : r);
            for (int c = 0; c < w.mColsOut * w.mColWin; ++c) {
                const dcomplex z = aLine[a.mColsInvert ? aPixels - 1 - c : c];
                if (fqorvIsNullCell(z.real(), z.imag(), aComplex, aNull)) continue;
                aSum[c / w.mColWin] += aComplex ? std::abs(z) : z.real();
                ++aCount[c / w.mColWin];
            }
        }
        for (int c = 0; c < w.mColsOut; ++c) aBytes[c] = fqorvStretchByte(aStretch, aSum[c], aCount[c]);
        if (TIFFWriteScanline(aTiff, aBytes.data(), static_cast<uint32_t>(o), 0) < 0) {
            if (aGtif) GTIFFree(aGtif);
            XTIFFClose(aTiff);
            failTiff(CQORV_ERR_WRITE_FILE, aTemp, "cannot write TIFF " + a.mOutput);
        }
        const int aNew = 15 + static_cast<int>(84LL * o / w.mRowsOut);
        if (aNew != aPercent) {
            getAndSetPerc(aPercent, aNew, nullptr);
            aPercent = aNew;
        }
    }
    aFile.close();

    fdfTrace("\n\n********************************************************************************\nMin all images = %lf\n"
             "Max all images = %lf - ;  Min : %lf;  Mean : %lf;  Max : %lf;   TIFF  Saturation : %lf;  Scale : %lf;  "
             "Exponent    : %lf\n",
             aStats.mMin, aStats.mMax, aStats.mMin, aStats.mMean, aStats.mMax, fqorvTiffSaturation(a.mSaturation),
             aStretch.mScale, aStretch.mExponent);

    // Keys and directory; a failing flush leaves no TIFF behind.
    if (aGtif) {
        GTIFWriteKeys(aGtif);
        GTIFFree(aGtif);
    }
    if (!TIFFFlush(aTiff)) {
        XTIFFClose(aTiff);
        failTiff(CQORV_ERR_WRITE_FILE, aTemp, "cannot write TIFF " + a.mOutput);
    }
    XTIFFClose(aTiff);

    // The product's header, then the TIFF under its own name.
    (*h)["RasterInfo.TiffMinValue"].setValue(aStats.mMin);
    (*h)["RasterInfo.TiffMaxValue"].setValue(aStats.mMax);
    (*h)["RasterInfo.NullCellValue"].setValue(aNull);
    (*h)["RasterInfo.TiffScale"].setValue(aStretch.mScale);
    (*h)["RasterInfo.TiffExponent"].setValue(aStretch.mExponent);
    (*h)["RasterInfo.TiffRowScale"].setValue(w.mRowWin);
    (*h)["RasterInfo.TiffColScale"].setValue(w.mColWin);
    (*h)["RasterInfo.TiffColsInvert"].setValue(a.mColsInvert ? "OK" : "NotOK");
    (*h)["RasterInfo.TiffRowsInvert"].setValue(a.mRowsInvert ? "OK" : "NotOK");
    (*h)["RasterInfo.CellType"].setValue("UNSIGNED_BYTE");
    (*h)["RasterInfo.NrOfLinesPerImage"].setValue(w.mRowsOut);
    (*h)["RasterInfo.NrOfPixelsPerLine"].setValue(w.mColsOut);
    const std::string aOutHeader = a.mOutput + "_hdr";
    if (!h->write(aOutHeader.c_str(), false, false)) failTiff(CQORV_ERR_CREATE_FILE, aTemp, aOutHeader);
    std::error_code aError;
    std::filesystem::rename(aTemp, a.mOutput, aError);
    if (aError) failTiff(CQORV_ERR_CREATE_FILE, aTemp, "cannot rename TIFF " + a.mOutput);
    return 0;
}
