// ENVI header output.
#include "qorv_envi_util.h"

#include <cmath>
#include <cstdio>
#include <cstring>
#include <memory>

#include "qorv_cell_types.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"

namespace {

constexpr const char* CQORV_ENVI_SECTION = "ENVI_HeaderDescriptionType";

// Index into "DATATYPE_VALS" by cell type code.
constexpr int CQORV_ENVI_DATATYPE_INDEX[CQORV_CELL_TYPE_NBR] = {
    5,   // BYTE
    11,  // BYTE_COMPLEX
    1,   // UNSIGNED_BYTE
    0,   // UBYTE_COMPLEX
    2,   // SHORT
    6,   // UNSIGNED_SHORT
    12,  // SHORT_COMPLEX
    9,   // FLOAT
    15,  // FLOAT_COMPLEX
    10,  // DOUBLE
    0,   // DOUBLE_COMPLEX
    7,   // UNSIGNED_INT
    3,   // INT
    1,   // BIT
    12,  // UNSIGNED_SHORT_COMPLEX
};

// Endings of header paths that describe no raster of their own.
constexpr const char* CQORV_ENVI_EXCLUDED[] = {
    ".tif_hdr", ".tif", "_orb", "_orb_hdr", ".orb", "_orb.sml", ".QorvexParameterExtracted", "_par", "_par_hdr",
};

bool endsExactly(const std::string& theText, const char* theEnd)
{
    const std::size_t n = std::strlen(theEnd);
    return theText.size() >= n && theText.compare(theText.size() - n, n, theEnd) == 0;
}

const CDescriptionField* setField(const CDescriptionHeader& theHeader, const char* theKey)
{
    const CDescriptionField* aField = theHeader.findField(theKey);
    return aField != nullptr && aField->isInitialised() ? aField : nullptr;
}

std::string number(double theValue)
{
    if (std::isnan(theValue)) return "NaN";
    return fqorvStringFormat("%.12g", theValue);
}

// One "key = value" line with the key set to the width; nothing for an empty key text.
void keyLine(std::string& theText, int theWidth, const char* theKey, const std::string& theValue)
{
    if (theKey == nullptr || theKey[0] == '\0') return;
    theText += fqorvStringFormat("%-*s = %s\n", theWidth, theKey, theValue.c_str());
}

const char* optionalString(const CDescriptionHeader& theDes, const char* theKey)
{
    const CDescriptionField* aField = setField(theDes, theKey);
    return aField != nullptr ? aField->getString() : "";
}

std::string opening(const CDescriptionHeader& theHeader)
{
    std::string aTimes;
    std::string aValue;
    if (fqorvGetUserKey(theHeader, "ACQUISITION TIME", aValue) || fqorvGetUserKey(theHeader, "NEW_ACQUISITION TIME", aValue))
        aTimes += "   ACQUISITION TIME = " + aValue + "\n";
    if (fqorvGetUserKey(theHeader, "MASTER ACQUISITION TIME", aValue))
        aTimes += "   MASTER ACQUISITION TIME = " + aValue + "\n";
    if (fqorvGetUserKey(theHeader, "SLAVE ACQUISITION TIME", aValue))
        aTimes += "   SLAVE ACQUISITION TIME = " + aValue + "\n";
    if (aTimes.empty()) return "ENVI\ndescription = {\n   File Imported into ENVI.}\n";
    return "ENVI\ndescription = {\n" + aTimes + "   File generated with Qorvex  4.3.000}\n";
}

bool isMSBF(const CDescriptionHeader& theHeader)
{
    const CDescriptionField* aOrder = setField(theHeader, "RasterInfo.BytesOrder");
    const std::string aText = aOrder != nullptr ? aOrder->getString() : fdfGetSetting(CQORV_DEFAULT_BYTE_ORDER);
    return aText == "MSBF";
}

void keyLines(std::string& theText, const CDescriptionHeader& theHeader, const CDescriptionHeader& theDes)
{
    const int aWidth = theDes["WIDTH_CHAR"].getInteger();
    const int aCellType = fqorvCellTypeFromName(theHeader["RasterInfo.CellType"].getString());
    keyLine(theText, aWidth, theDes["NCOLS_NAME"].getString(),
            std::to_string(theHeader["RasterInfo.NrOfPixelsPerLine"].getInteger()));
    keyLine(theText, aWidth, theDes["NROWS_NAME"].getString(),
            std::to_string(theHeader["RasterInfo.NrOfLinesPerImage"].getInteger()));
    keyLine(theText, aWidth, theDes["NBANDS_NAME"].getString(), aCellType == CQORV_CELL_SHORT_COMPLEX ? "2" : "1");
    keyLine(theText, aWidth, optionalString(theDes, "HEADERBYTES_NAME"),
            std::to_string(theHeader["RasterInfo.HeaderOffset"].getInteger()));
    keyLine(theText, aWidth, optionalString(theDes, "FILE_TYPE_NAME"), "ENVI Standard");
    if (aCellType >= 0)
        keyLine(theText, aWidth, optionalString(theDes, "DATATYPE_NAME"),
                theDes["DATATYPE_VALS"].getString(CQORV_ENVI_DATATYPE_INDEX[aCellType]));
    else
        fdfTrace(" writeRasterHeaderEnvi unknown cell type : %s\n", theHeader["RasterInfo.CellType"].getString());
    keyLine(theText, aWidth, theDes["SENSOR_TYPE"].getString(), "Unknown");
    keyLine(theText, aWidth, theDes["LAYOUT_NAME"].getString(), theDes["LAYOUT_VALS"].getString(2));
    keyLine(theText, aWidth, theDes["BYTEORDER_NAME"].getString(),
            theDes["BYTEORDER_VALS"].getString(isMSBF(theHeader) ? 1 : 0));
}

void mapInfo(std::string& theText, const CDescriptionHeader& theHeader)
{
    const CDescriptionField* aGeocoded = setField(theHeader, "RasterInfo.GeocodedImage");
    const CDescriptionField* aState = setField(theHeader, "CartographicSystem.State");
    if (aGeocoded == nullptr || std::strcmp(aGeocoded->getString(), "OK") != 0 || aState == nullptr ||
        setField(theHeader, "RegistrationCoordinates.LonEasting") == nullptr)
        return;
    const std::string aNumbers = ", " + number(theHeader["RegistrationCoordinates.LonEasting"].getDouble()) + ", " +
                                 number(theHeader["RegistrationCoordinates.LatNorthing"].getDouble()) + ", " +
                                 number(theHeader["RegistrationCoordinates.PixelSpacingLonEast"].getDouble()) + ", " +
                                 number(theHeader["RegistrationCoordinates.PixelSpacingLatNorth"].getDouble());
    const std::string aStateText = aState->getString();
    if (aStateText == "UTM-GLOBAL") {
        const CDescriptionField* aZone = setField(theHeader, "CartographicSystem.Zone");
        const CDescriptionField* aHemisphere = setField(theHeader, "CartographicSystem.Hemisphere");
        const bool aSouth = aHemisphere != nullptr && std::strcmp(aHemisphere->getString(), "SOUTH") == 0;
        theText += "map info = {UTM, 1, 1" + aNumbers + ",\n " + std::to_string(aZone != nullptr ? aZone->getInteger() : 0) +
                   (aSouth ? ", South" : ", North") + ", WGS-84, units=Meters }\n";
    } else if (aStateText == "GEO-GLOBAL") {
        theText += "map info = {Geographic Lat/Lon, 1, 1" + aNumbers + ", WGS-84, \n units=Degrees}\n";
    } else {
        // Other projections: their parameters ("projection info") belong to the map services.
        const CDescriptionField* aUnits = setField(theHeader, "CartographicSystem.Units");
        const bool aDegrees = aUnits != nullptr && std::strcmp(aUnits->getString(), "Degrees") == 0;
        const CDescriptionField* aDatum = setField(theHeader, "CartographicSystem.DatumShift");
        theText += "map info = {" + aStateText + ", 1.0, 1.0" + aNumbers + ", " +
                   (aDatum != nullptr ? aDatum->getString() : "WGS-84") + ", units=" + (aDegrees ? "Degrees" : "Meters") +
                   " }\n";
    }
}

void pixelSize(std::string& theText, const CDescriptionHeader& theHeader)
{
    const CDescriptionField* aGeocoded = setField(theHeader, "RasterInfo.GeocodedImage");
    if (aGeocoded != nullptr && std::strcmp(aGeocoded->getString(), "OK") == 0) return;
    const CDescriptionField* aProjection = setField(theHeader, "InitialGeometry.Projection");
    const CDescriptionField* aRange = setField(theHeader, "Processing.PixelSpacingRg");
    const CDescriptionField* aAzimuth = setField(theHeader, "Processing.PixelSpacingAz");
    if (theHeader.getSection("Processing") == nullptr || aProjection == nullptr || aRange == nullptr || aAzimuth == nullptr)
        return;
    double aRangeSpacing = aRange->getDouble();
    const CDescriptionField* aIncidence = setField(theHeader, "ChannelInfo.IncidenceAngle");
    // A slant range spacing is told on the ground: divided by the sine of the incidence angle.
    if (std::strcmp(aProjection->getString(), "SLANT_RANGE") == 0 && aIncidence != nullptr)
        aRangeSpacing /= std::sin(aIncidence->getDouble() * M_PI / 180.0);
    theText += "pixel size = {" + number(aRangeSpacing) + ", " + number(aAzimuth->getDouble()) + ", units=Meters}\n";
}

void classification(std::string& theText, const CDescriptionHeader& theHeader)
{
    const CDescriptionField* aNames = setField(theHeader, "RasterInfo.ClassificationName");
    const int aClasses = aNames != nullptr ? aNames->getNbrOfElements() : 0;
    theText += "file type = ENVI Classification\n";
    theText += "classes = " + std::to_string(aClasses) + "\n";
    const CDescriptionField* aRed = setField(theHeader, "RasterInfo.TiffLUTRed");
    const CDescriptionField* aGreen = setField(theHeader, "RasterInfo.TiffLUTGreen");
    const CDescriptionField* aBlue = setField(theHeader, "RasterInfo.TiffLUTBlue");
    if (aRed != nullptr && aGreen != nullptr && aBlue != nullptr) {
        // The palette holds 16-bit TIFF entries; ENVI wants 8-bit colours.
        auto aColour = [](const CDescriptionField* f, int i) {
            if (i >= f->getNbrOfElements()) return 0;
            const int v = f->getInteger(i);
            return v > 255 ? v >> 8 : v;
        };
        theText += "class lookup = {\n";
        for (int i = 0; i < aClasses; ++i)
            theText += fqorvStringFormat("%s%d, %d, %d", i == 0 ? " " : ", ", aColour(aRed, i), aColour(aGreen, i),
                                         aColour(aBlue, i));
        theText += "}\n";
    }
    theText += "class names = {\n";
    for (int i = 0; i < aClasses; ++i) theText += std::string(i == 0 ? " " : ", ") + aNames->getString(i);
    theText += "}\n";
}

void tailLines(std::string& theText, const CDescriptionHeader& theHeader)
{
    if (theHeader.getSection("RasterInfo") != nullptr) {
        const CDescriptionField* aNull = setField(theHeader, "RasterInfo.NullCellValue");
        if (aNull != nullptr && !NQORV_UTILITY::isNullValue(aNull->getDouble(), gDummyFloat))
            theText += "Data Ignore Value = " + number(aNull->getDouble()) + "\n";
    }
    const CDescriptionField* aUnits = setField(theHeader, "RasterInfo.DataUnits");
    if (aUnits == nullptr) return;
    const int aUnitsCode = fqorvDataUnitsFromName(aUnits->getString());
    if (aUnitsCode == CQORV_UNITS_INTERFEROGRAMME || aUnitsCode == CQORV_UNITS_FLATTENED_INTERFEROGRAMME)
        theText += "complex function = Phase\n";
    else if (aUnitsCode == CQORV_UNITS_SLC)
        theText += "complex function = Magnitude\n";
    else if (aUnitsCode == CQORV_UNITS_CLASSIFICATION)
        classification(theText, theHeader);
}

}  // namespace

std::string fqorvEnviHeaderName(const char* thePath)
{
    std::string aName = thePath != nullptr ? thePath : "";
    if (endsExactly(aName, "_hdr")) aName.resize(aName.size() - 4);
    else if (endsExactly(aName, ".sml")) aName.resize(aName.size() - 4);
    return aName + ".hdr";
}

bool fqorvEnviHeaderExcluded(const char* thePath)
{
    if (thePath == nullptr) return true;
    std::string aPath = thePath;
    // "x_par.sml" names the same file as "x_par": the endings are tested on both forms.
    std::string aCut = endsExactly(aPath, ".sml") ? aPath.substr(0, aPath.size() - 4) : aPath;
    for (const char* aEnd : CQORV_ENVI_EXCLUDED)
        if (endsExactly(aPath, aEnd) || endsExactly(aCut, aEnd)) return true;
    return false;
}

void writeRasterHeaderEnvi(const char* thePath)
{
    writeRasterHeaderEnvi(thePath, nullptr);
}

void writeRasterHeaderEnvi(const char* thePath, const char* theType)
{
    if (fqorvEnviHeaderExcluded(thePath)) {
        fdfTrace(" writeRasterHeaderEnvi NO CREATE ENVI .hdr for : %s\n", thePath != nullptr ? thePath : "");
        return;
    }
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    const bool aRead = aHeader->read(thePath, false);
    if (!aRead || setField(*aHeader, "RasterInfo.RowPrefix") == nullptr) {
        fdfTrace("NOT FOUND : %s\n", thePath);
        return;
    }
    const std::string aDesPath = fdfGetSetting(CQORV_CEOS_DES_FILES_DIR) + "ENVI_descriptions_" +
                                 (theType != nullptr && theType[0] != '\0' ? theType : "default") + ".des";
    CDescriptionHeader aDes({CQORV_ENVI_SECTION});
    if (!fqorvFileExists(aDesPath) || !aDes.read(aDesPath.c_str(), false)) {
        fdfTrace("SEC_FILE_NOT_FOUND : %s\n", aDesPath.c_str());
        return;
    }

    std::string aText = opening(*aHeader);
    keyLines(aText, *aHeader, aDes);
    mapInfo(aText, *aHeader);
    pixelSize(aText, *aHeader);
    const int aWidth = aDes["WIDTH_CHAR"].getInteger();
    keyLine(aText, aWidth, aDes["ULXMAP_NAME"].getString(), "1");
    keyLine(aText, aWidth, aDes["ULYMAP_NAME"].getString(), "1");
    tailLines(aText, *aHeader);

    const std::string aEnviName = fqorvEnviHeaderName(thePath);
    if (!fqorvWriteTextAtomically(aEnviName, aText)) {
        fdfTrace("Error: cannot write the file: %s  errno = %d\n", aEnviName.c_str(), errno);
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aEnviName.c_str());
    }
}

void fqorvRegisterEnviHeaderWriter()
{
    fqorvSetEnviHeaderWriter(static_cast<QorvHeaderWrittenHook>(&writeRasterHeaderEnvi));
}
