// Step 0: processing parameter construction.
#include "qorv_proc_param.h"

#include <string>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"

namespace {

void fUsage(const char* theProgram)
{
    fdfTrace("\nusage: %s<processing_param> <raw_data> <input_file>\n\n", theProgram ? theProgram : "");
    fdfTrace("input parameter: \n");
    fdfTrace("processing_param    processing parameter file name (output)\n");
    fdfTrace("raw_data             raw data file name (input of the processing chain)\n");
    fdfTrace("input_file           default parameter (input)\n");
}

/// The seven values that stand when the defaults file can't be read.
void fSetBuiltInDefaults(CDescriptionHeader& theParameters)
{
    theParameters["sar_processing.FirstPixel"].setValue(0);
    theParameters["sar_processing.FirstLine"].setValue(0);
    theParameters["sar_processing.AzBandWidthFraction"].setValue(0.8);
    theParameters["sar_processing.AzPresumming"].setValue(1);
    theParameters["sar_processing.AzSubaperture"].setValue(1);
    theParameters["sar_processing.AzDetectionLooks"].setValue(1);
    theParameters["sar_processing.RgDetectionLooks"].setValue(1);
}

/// Fills the product's own values while they are empty; a velocity of the input always wins.
void fFillFromInput(CDescriptionHeader& theParameters, const CDescriptionHeader& theInput)
{
    CDescriptionField& aTitle = theParameters["sar_processing.Title"];
    if (aTitle.isEmpty()) aTitle.setValue(theInput["Sensor.SensorName"].getString());
    CDescriptionField& aChannel = theParameters["sar_processing.Channel"];
    if (aChannel.isEmpty()) aChannel.setValue(theInput["ChannelInfo.Description"].getString(0));
    CDescriptionField& aRgFFT = theParameters["sar_processing.RgFFT"];
    if (aRgFFT.isEmpty()) aRgFFT.setValue(theInput["RasterInfo.NrOfPixelsPerLine"].getInteger());
    CDescriptionField& aLines = theParameters["sar_processing.ProcessedLines"];
    if (aLines.isEmpty()) aLines.setValue(theInput["RasterInfo.NrOfLinesPerImage"].getInteger());
    CDescriptionField& aVelocity = theParameters["sar_processing.Velocity"];
    if (aVelocity.isEmpty()) aVelocity.setValue(0.0);
    const CDescriptionField& aInputVelocity = theInput["Processing.ProcessingVelocity"];
    if (aInputVelocity.isInitialised()) aVelocity.setValue(aInputVelocity.getDouble(0));
}

}  // namespace

int qorv_proc_param(int argc, char** argv)
{
    fdfTrace("*** VDQ processing parameter definition v1.4 29-oct-99 xq ***\n");
    if (argc < 3) {
        fUsage(argc > 0 ? argv[0] : nullptr);
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    const std::string aParameterFile = argv[1];
    const std::string aRawHeader = std::string(argv[2]) + "_hdr";

    CDescriptionHeader aSARProcessingParameters({"sar_processing"});
    std::unique_ptr<CDescriptionHeader> aInputHeader = CDescriptionHeader::makeFull();

    if (!aInputHeader->read(aRawHeader.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", aRawHeader.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, aRawHeader.c_str());
    }
    const std::string aDefaults = fdfGetSetting(CQORV_CEOS_DES_FILES_DIR) + CQORV_PROC_PARAM_DEFAULTS_FILE;
    if (!aSARProcessingParameters.read(aDefaults.c_str(), false)) {
        fSetBuiltInDefaults(aSARProcessingParameters);
        fdfTrace("Error: missing processing parameter file %s\n", aDefaults.c_str());
    }
    fFillFromInput(aSARProcessingParameters, *aInputHeader);

    fdfTrace("writing new parameters to parameter file %s\n", aParameterFile.c_str());
    if (!aSARProcessingParameters.write(aParameterFile.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aParameterFile.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aParameterFile.c_str());
    }
    return 0;
}
