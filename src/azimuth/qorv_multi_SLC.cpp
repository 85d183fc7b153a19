// Step 6 "multi look": SLC in, multi-looked intensity image (MLI) out.
//
// The front end reads the SLC header once into CMultiLookParam, writes the MLI under
// "<MLI>_tmp" line block by line block through CMultiLookAverager, writes its header, and only
// then renames raster and header to "<MLI>": a run that stops half-way leaves no "<MLI>".
#include "qorv_multi_SLC.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "qorv_AzSubaperture_multi_SLC.h"
#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_identifiers.h"
#include "qorv_multilook_kernel.h"
#include "qorv_multilook_services.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "tools_raster_file_exp.h"

namespace {

constexpr int CQORV_ML_ARGUMENT_NBR = 10;
constexpr int CQORV_ML_BUFFER_LINES = 1000;
constexpr double CQORV_ML_NO_MIN_VALUE = -999999.0;
constexpr double CQORV_ML_ALOS_GATE = 16000.0;
// The multi-look of several azimuth subapertures hands over to its own step; the chain has one.
constexpr int aSubapertureNumber = 1;

/// What the step needs of its arguments and of the SLC header.
struct CMultiLookParam {
    std::string mSlcName;
    std::string mMliName;
    std::string mWriteName;     // "<MLI>_tmp", renamed to mMliName at the end
    int mRangeLooks = 1;        // rl
    int mAzimuthLooks = 1;      // al
    int mInputWidth = 0;        // W
    int mInputLines = 0;        // H
    float mOutputNull = 0.0f;
    double mGate = 0.0;         // argument 6; 16000.0 for the ALOS PALSAR products
    bool mAlos = false;
    bool mCutByRename = false;  // argument 7 "OK": the cut file replaces the MLI by renaming
    int mCutPixelsSize = -1;
    double mMinValueAdmit = CQORV_ML_NO_MIN_VALUE;
};

void fUsage(const char* theProgram)
{
    fdfTrace("\nusage: %s <SLC_image> <ML_image> <proc_param> [#rlks] [#azlks] \n\n", theProgram ? theProgram : "");
    fdfTrace("    SLC_image   input SLC image file\n");
    fdfTrace("    MLI_image   output MLI image file\n");
    fdfTrace("    proc_param  processing parameter file \n");
    fdfTrace("    #rlks       number of range looks\n");
    fdfTrace("    #azlks      number of azimuth looks\n");
}

/// A number argument, or theDefault when the text holds "NotOK".
double fNumberArgument(const char* theText, double theDefault)
{
    return std::strstr(theText, "NotOK") != nullptr ? theDefault : std::atof(theText);
}

const CDescriptionField* fSetField(const CDescriptionHeader& theHeader, const char* theKey)
{
    const CDescriptionField* aField = theHeader.findField(theKey);
    return aField != nullptr && aField->isInitialised() ? aField : nullptr;
}

bool fIsAlosPalsarProduct(int theProductId)
{
    static const int aIds[] = {37, 38, 39, 105, 106, 107};
    return std::find(std::begin(aIds), std::end(aIds), theProductId) != std::end(aIds);
}

/// Reads the SLC header (all sections); a missing one is failure 261122.
std::unique_ptr<CDescriptionHeader> fReadInputHeader(const std::string& theSlcName)
{
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    const std::string aName = theSlcName + "_hdr";
    if (!aHeader->read(aName.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", aName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, aName.c_str());
    }
    return aHeader;
}

/// Range and azimuth looks: the arguments, else the header's suggestion, else the rule, else 1 x 1.
void fResolveLooks(const CDescriptionHeader& theInput, CMultiLookParam& theParam, char** argv)
{
    // Text of a real number ("3.000000") counts as its integer part.
    theParam.mRangeLooks = std::atoi(argv[4]);
    theParam.mAzimuthLooks = std::atoi(argv[5]);
    if (theParam.mRangeLooks >= 1 && theParam.mAzimuthLooks >= 1) return;

    const CDescriptionField* aSuggestedAz = fSetField(theInput, "SuggestedAzimuthLooks");
    const CDescriptionField* aSuggestedRg = fSetField(theInput, "SuggestedRangeLooks");
    if (aSuggestedAz != nullptr && aSuggestedRg != nullptr) {
        theParam.mRangeLooks = aSuggestedRg->getInteger();
        theParam.mAzimuthLooks = aSuggestedAz->getInteger();
    } else {
        double aRgGround = 0.0, aAzGround = 0.0;
        if (fqorvSuggestedLooksFromFile(theParam.mSlcName.c_str(), theParam.mRangeLooks, theParam.mAzimuthLooks,
                                        aRgGround, aAzGround) != 1)
            theParam.mRangeLooks = theParam.mAzimuthLooks = 1;
    }
    // A suggestion stored by another program may be 0; it can't make a rectangle.
    if (theParam.mRangeLooks < 1 || theParam.mAzimuthLooks < 1) theParam.mRangeLooks = theParam.mAzimuthLooks = 1;
}

/// Arguments, output name, preparation of the SLC header and the looks.
CMultiLookParam fSetUp(char** argv, CDescriptionHeader& theInput)
{
    CMultiLookParam aParam;
    aParam.mSlcName = argv[1];
    aParam.mMliName = argv[2];
    aParam.mWriteName = aParam.mMliName + "_tmp";
    aParam.mCutByRename = std::strcmp(argv[7], "OK") == 0;
    aParam.mCutPixelsSize = static_cast<int>(fNumberArgument(argv[8], -1.0));
    aParam.mMinValueAdmit = fNumberArgument(argv[9], CQORV_ML_NO_MIN_VALUE);

    std::string aOrigin;
    if (fqorvGetUserKey(theInput, "ORIGIN DATA", aOrigin)) aParam.mAlos = fIsAlosPalsarProduct(fqorvOrigProdStrToID(aOrigin.c_str()));
    aParam.mGate = aParam.mAlos ? CQORV_ML_ALOS_GATE : std::atof(argv[6]);

    const CDescriptionField* aReference = fSetField(theInput, "StateVectorReference");
    if (aReference != nullptr && std::strncmp(aReference->getString(), "IRS", 3) == 0)
        fqorvMultiLookConvertStateVectors(theInput);

    aParam.mInputWidth = theInput["RasterInfo.NrOfPixelsPerLine"].getInteger();
    aParam.mInputLines = theInput["RasterInfo.NrOfLinesPerImage"].getInteger();
    aParam.mOutputNull = gDummyFloat;
    fResolveLooks(theInput, aParam, argv);
    if (aParam.mInputWidth / aParam.mRangeLooks < 1 || aParam.mInputLines / aParam.mAzimuthLooks < 1) {
        const std::string aText = "looks " + std::to_string(aParam.mRangeLooks) + " x " +
                                  std::to_string(aParam.mAzimuthLooks) + " exceed the image";
        fdfTrace("\nError: %s\n", aText.c_str());
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, aText.c_str());
    }
    return aParam;
}

/// The MLI header: a copy of the SLC header with looks, spacings, sizes and cell description.
void fMakeOutputHeader(const CDescriptionHeader& theInput, const CMultiLookParam& theParam, CDescriptionHeader& theOut)
{
    const int rl = theParam.mRangeLooks;
    const int al = theParam.mAzimuthLooks;
    theOut.copyFrom(theInput, false);

    theOut["Processing.NAzimuthLooks"].setValue(al * aSubapertureNumber * theInput["Processing.NAzimuthLooks"].getInteger());
    theOut["Processing.NRangeLooks"].setValue(rl * theInput["Processing.NRangeLooks"].getInteger());
    // Both "from input image" factors are decided by the range field, which the SLC sets or not.
    const bool aFromInSet = theOut["FromInImageRangeLooks"].isInitialised();
    theOut["FromInImageRangeLooks"].setValue(aFromInSet ? rl * theInput["FromInImageRangeLooks"].getInteger() : rl);
    theOut["FromInImageAzimuthLooks"].setValue(aFromInSet ? al * theInput["FromInImageAzimuthLooks"].getInteger() : al);
    if (const CDescriptionField* aResolution = fSetField(theInput, "Processing.ResolutionRange"))
        theOut["Processing.ResolutionRange"].setValue(rl * aResolution->getDouble());
    theOut["Processing.ResolutionAzimuth"].setValue(al * theInput["Processing.ResolutionAzimuth"].getDouble());
    fqorvSetUserKey(theOut, "LOOKS RANGE NUMBER", std::to_string(theOut["Processing.NRangeLooks"].getInteger()).c_str());
    fqorvSetUserKey(theOut, "LOOKS AZIMUTH NUMBER", std::to_string(theOut["Processing.NAzimuthLooks"].getInteger()).c_str());
    theOut["PixelSpacingRg"].setValue(rl * theInput["PixelSpacingRg"].getDouble());
    theOut["PixelSpacingAz"].setValue(al * theInput["PixelSpacingAz"].getDouble());

    theOut["RasterInfo.NrOfPixelsPerLine"].setValue(theParam.mInputWidth / rl);
    theOut["RasterInfo.NrOfLinesPerImage"].setValue(theParam.mInputLines / al);
    for (const char* aKey : {"RasterInfo.FooterLen", "RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix"})
        theOut[aKey].setValue(0);
    theOut["RasterInfo.CellType"].setValue("FLOAT");
    theOut["RasterInfo.NullCellValue"].setValue(static_cast<double>(theParam.mOutputNull));
    theOut["RasterInfo.BytesOrder"].setValue(fdfGetSetting(CQORV_DEFAULT_BYTE_ORDER));
    const CDescriptionField* aUnits = fSetField(theInput, "RasterInfo.DataUnits");
    const bool aKeepUnits = aUnits != nullptr && (std::strcmp(aUnits->getString(), "AMPLITUDE") == 0 ||
                                                  std::strcmp(aUnits->getString(), "SQUARE ROOT") == 0);
    if (!aKeepUnits) theOut["RasterInfo.DataUnits"].setValue("POWER");
}

/// Writes theLines buffered output lines from theFirstRow on, in the raster's time directions.
void fWriteBlock(CRasterFile& theRaster, std::vector<float>& theBlock, int theFirstRow, int theLines, int theWidth)
{
    if (theLines == 0) return;
    if (!theRaster.isLinesTimeDecrease() && !theRaster.isPixelsTimeDecrease()) {
        theRaster.writeLines(theFirstRow, theLines, theBlock.data());
        return;
    }
    for (int i = 0; i < theLines; ++i) {
        float* aLine = theBlock.data() + static_cast<std::size_t>(i) * theWidth;
        if (theRaster.isPixelsTimeDecrease()) std::reverse(aLine, aLine + theWidth);
        const int aRow = theFirstRow + i;
        theRaster.writeLines(theRaster.isLinesTimeDecrease() ? theRaster.getNrOfLines() - 1 - aRow : aRow, 1, aLine);
    }
}

/// The power sum: H/al output lines, each the mean of al input lines in rectangles of rl columns.
void fProcessLines(CRasterFile& theIn, CRasterFile& theOut, const CMultiLookParam& theParam)
{
    const int al = theParam.mAzimuthLooks;
    const int aOutLines = theParam.mInputLines / al;
    CMultiLookAverager aAverager(theParam.mInputWidth, theParam.mRangeLooks, theIn.getDummyVal(), theParam.mOutputNull);
    const int aOutWidth = aAverager.outputWidth();
    std::vector<double> aPower(static_cast<std::size_t>(theParam.mInputWidth));
    std::vector<float> aBlock(static_cast<std::size_t>(CQORV_ML_BUFFER_LINES) * aOutWidth);
    fdfTrace("Buffer line number = %d\n", CQORV_ML_BUFFER_LINES);
    fdfTrace("Buffer line size = %d\n", aOutWidth);
    fdfTrace("++++++++++++++++ MULTI SLC \n");

    int aPercent = 0;
    int aHeld = 0;
    for (int y = 0; y < aOutLines; ++y) {
        const int aNewPercent = static_cast<int>(static_cast<double>(y) / aOutLines * 99.0) + 1;
        if (aNewPercent != aPercent && aNewPercent < 100) {
            if (!getAndSetPerc(aPercent, aNewPercent, nullptr)) {
                fdfTrace("\n EXECUTION INTERRUPTED BY OPERATOR\n");
                QORV_FATAL(CQORV_ERR_OPERATOR_STOP, "");
            }
            aPercent = aNewPercent;
        }
        if (aHeld == CQORV_ML_BUFFER_LINES) {
            fWriteBlock(theOut, aBlock, y - aHeld, aHeld, aOutWidth);
            aHeld = 0;
        }
        for (int i = 0; i < al; ++i) {
            fqorvReadLine(theIn, aPower.data(), y * al + i);
            aAverager.addLine(aPower.data());
        }
        aAverager.takeLine(aBlock.data() + static_cast<std::size_t>(aHeld) * aOutWidth);
        ++aHeld;
    }
    fWriteBlock(theOut, aBlock, aOutLines - aHeld, aHeld, aOutWidth);
}

/// The MLI takes its final name, and its null borders are cut when asked.
void fFinish(const CMultiLookParam& theParam)
{
    fqorvRenameProduct(theParam.mWriteName.c_str(), theParam.mMliName.c_str());
    if (theParam.mCutPixelsSize > 0) {
        getAndSetPerc(-1, 0, "CUT DUMMY VALUES");
        const std::string aCut = theParam.mMliName + "_tmp_CUT";
        if (fqorvMultiLookCutDummyValues(theParam.mMliName.c_str(), aCut.c_str(), theParam.mCutPixelsSize,
                                         theParam.mMinValueAdmit) == 1) {
            if (theParam.mCutByRename)
                fqorvRenameProduct(aCut.c_str(), theParam.mMliName.c_str());
            else
                fqorvCopyProduct(aCut.c_str(), theParam.mMliName.c_str());
        }
    }
}

}  // namespace

int fqorvSuggestedLooksFromFile(const char* theName, int& theRangeLooks, int& theAzimuthLooks,
                                double& theRangeGroundSpacing, double& theAzimuthGroundSpacing)
{
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    const std::string aName = theName != nullptr ? theName : "";
    bool aLoaded = false;
    for (const std::string& aTry : {aName + "_hdr", aName + "_slc_hdr", aName + "_slc"}) {
        fdfTrace("\nRead parameter file [%s]\n\n", aTry.c_str());
        if ((aLoaded = aHeader->read(aTry.c_str(), false))) break;
    }
    if (!aLoaded) {
        fdfTrace("Error while reading parameter file %s\n", aName.c_str());
        return -1;
    }
    // The range angle: the last of these that holds a value, else 23 degrees.
    double aRangeAngle = 23.0;
    for (const char* aKey : {"ChannelInfo.RadarsatLookAngle", "ChannelInfo.RangeLookAngle", "ChannelInfo.IncidenceAngle"})
        if (const CDescriptionField* aAngle = fSetField(*aHeader, aKey)) aRangeAngle = aAngle->getDouble();
    const double aAzimuthAngle = 90.0;
    const bool aOk = fqorvSuggestedLooks((*aHeader)["PixelSpacingRg"].getDouble(), (*aHeader)["PixelSpacingAz"].getDouble(),
                                         aRangeAngle, aAzimuthAngle, theRangeLooks, theAzimuthLooks,
                                         theRangeGroundSpacing, theAzimuthGroundSpacing);
    return aOk ? 1 : -1;
}

int qorv_multi_SLC(int argc, char** argv)
{
    fdfTrace("*** VDQ SAR SLC --> MULTILOOK INTENSITY IMAGE v2.4 29-oct-99 xq ***\n");
    if (argc < CQORV_ML_ARGUMENT_NBR) {
        fUsage(argc > 0 ? argv[0] : nullptr);
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, "");
    }
    if (aSubapertureNumber > 1) return qorv_AzSubaperture_multi_SLC(argc, argv);

    std::unique_ptr<CDescriptionHeader> aInput = fReadInputHeader(argv[1]);
    const CMultiLookParam aParam = fSetUp(argv, *aInput);

    // An SLC without a null value gets the system's, so that no sample is taken for null by chance.
    if (!(*aInput)["RasterInfo.NullCellValue"].isInitialised())
        (*aInput)["RasterInfo.NullCellValue"].setValue(static_cast<double>(gDummyDouble));
    CRasterFileParam aInParam;
    fqorvRasterParamFromHeader(*aInput, aParam.mSlcName.c_str(), aInParam);
    CRasterFile aIn;
    aIn.openRead(aInParam);

    std::unique_ptr<CDescriptionHeader> aOutput = CDescriptionHeader::makeFull();
    fMakeOutputHeader(*aInput, aParam, *aOutput);
    fdfTrace("#range looks, #az. looks/subaper.:    %d  %d\n", aParam.mRangeLooks, aParam.mAzimuthLooks);
    fdfTrace("MLI image size range, azimuth:        %d  %d\n", aParam.mInputWidth / aParam.mRangeLooks,
             aParam.mInputLines / aParam.mAzimuthLooks);
    CRasterFileParam aOutParam;
    fqorvRasterParamFromHeader(*aOutput, aParam.mWriteName.c_str(), aOutParam);
    CRasterFile aOut;
    aOut.openWrite(CQORV_RF_OPEN_WRITE, aOutParam);

    fProcessLines(aIn, aOut, aParam);
    aOut.close();
    aIn.close();

    std::string aOrigin;
    fqorvGetUserKey(*aInput, "ORIGIN DATA", aOrigin);
    const std::string aScene = std::string((*aInput)["Sensor.SensorName"].getString()) + " " + aOrigin;
    fqorvSetUserKey(*aOutput, "SCENE DATA", aScene.c_str());
    fqorvSetUserKey(*aOutput, "ACQUISITION TIME", (*aInput)["AzimuthStartTime"].getString());
    const std::string aHeaderName = aParam.mWriteName + "_hdr";
    fdfTrace("writing new parameters to parameter file %s\n", aHeaderName.c_str());
    if (!aOutput->write(aHeaderName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_WRONG_REQUEST, aHeaderName.c_str());
    }

    fFinish(aParam);
    QORV_WARNING(0, "");
    return 0;
}

bool fqorvMultiLookImage(const char* theSlc, const char* theMli, double theAzimuthLooks, double theRangeLooks,
                         bool theCutByRename, bool theGate16000, const char* theCutPixelsSize,
                         const char* theMinValueAdmit)
{
    std::string aArgs[CQORV_ML_ARGUMENT_NBR] = {"FOCUSSING", theSlc, theMli, "NotOK",
                                                fqorvStringFormat("%lf", theRangeLooks),
                                                fqorvStringFormat("%lf", theAzimuthLooks),
                                                theGate16000 ? "16000" : "NotOK", theCutByRename ? "OK" : "NotOK",
                                                theCutPixelsSize, theMinValueAdmit};
    char* aArgv[CQORV_ML_ARGUMENT_NBR];
    for (int i = 0; i < CQORV_ML_ARGUMENT_NBR; ++i) aArgv[i] = aArgs[i].data();
    return qorv_multi_SLC(CQORV_ML_ARGUMENT_NBR, aArgv) == 0;
}
