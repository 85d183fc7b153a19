#include "qorv_prf_extraction.h"

#include <bit>
#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_identifiers.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "qorv_store_io.h"

namespace {

/// Byte offset of the PRI code (unsigned 16-bit) in a raw echo line's prefix.
constexpr int CQORV_PRI_CODE_POS = 60;
/// Duration of one PRI code unit, in seconds.
constexpr double CQORV_PRI_CODE_UNIT = 210.94 / 1000000000.0;

struct CPrfSegment {
    int mFirstLine;
    int mCode;
    double mPrf;
};

/// The PRF of a PRI code: the period is (code + 2) code units. The sensor 4 road takes the code
/// as a count of samples; the chain leaves it unused and it is kept beside the first.
double prfOfCode(int theCode, int theSensor, double theSamplingRate)
{
    const double aPeriod = theSensor == CSAR_SENSOR_ENVISAT1_ID ? theCode / theSamplingRate
                                                                : (theCode + 2) * CQORV_PRI_CODE_UNIT;
    return 1.0 / aPeriod;
}

/// Scans every line's prefix for its PRI code and returns one segment per run of equal codes.
std::vector<CPrfSegment> scanLines(CRasterFile& theRaster, bool theSwap, int theSensor, double theSamplingRate)
{
    std::vector<uint8_t> aPrefix(static_cast<std::size_t>(theRaster.getRowPrefix()));
    std::vector<CPrfSegment> aSegments;
    const int aLines = theRaster.getNrOfLines();
    int aPercent = -1;
    for (int aLine = 0; aLine < aLines; ++aLine) {
        const int aNewPercent = static_cast<int>(static_cast<long long>(aLine) * 100 / aLines);
        if (aNewPercent != aPercent && aNewPercent < 100) {
            if (!getAndSetPerc(aPercent, aNewPercent, nullptr)) {
                fdfTrace("\n EXECUTION INTERRUPTED BY OPERATOR\n");
                QORV_FATAL(CQORV_ERR_OPERATOR_STOP, nullptr);
            }
            aPercent = aNewPercent;
        }
        theRaster.readRowPrefix(aLine, aPrefix.data());
        uint16_t aCode = 0;
        std::memcpy(&aCode, aPrefix.data() + CQORV_PRI_CODE_POS, sizeof aCode);
        if (theSwap) aCode = static_cast<uint16_t>((aCode >> 8) | (aCode << 8));
        const double aPrf = prfOfCode(aCode, theSensor, theSamplingRate);
        if (aSegments.empty()) {
            aSegments.push_back({0, aCode, aPrf});
        } else if (aCode != aSegments.back().mCode) {
            const CPrfSegment& aLast = aSegments.back();
            fdfTrace("\nOLD PRIC[%d];  NEW PRIC [%d];   OLD PRF[%lf];  NEW PRF[%lf]]PRF CHANGE = %d", aLast.mCode,
                     static_cast<int>(aCode), aLast.mPrf, aPrf, aLine);
            aSegments.push_back({aLine, aCode, aPrf});
        }
    }
    return aSegments;
}

/// Records the segments in "ChannelInfo.PRFChanges" and reports them in the log.
void recordSegments(CDescriptionHeader& theHeader, const std::vector<CPrfSegment>& theSegments, const char* theInput)
{
    const int n = static_cast<int>(theSegments.size());
    if (n < 2) {
        fdfLog("\n\nNO PRF :  %lf  CHANGES in file %s\n", n > 0 ? theSegments[0].mPrf : 0.0, theInput);
    } else {
        fdfLog("\n\nCHANGES IN PRF - *********************** %d PRF CHANGES in %s\n", n - 1, theInput);
    }
    CDescriptionField& aChanges = theHeader["ChannelInfo.PRFChanges"];
    aChanges.resize(n, 2);
    for (int i = 0; i < n; ++i) {
        aChanges.setValue(i, 0, static_cast<double>(theSegments[static_cast<std::size_t>(i)].mFirstLine));
        aChanges.setValue(i, 1, theSegments[static_cast<std::size_t>(i)].mPrf);
        if (n > 1)
            fdfLog("PRI CODE[%d] = [%d]-  PRF[%d]= %lf\n", i, theSegments[static_cast<std::size_t>(i)].mCode, i,
                   theSegments[static_cast<std::size_t>(i)].mPrf);
    }
    if (n > 1) fdfLog("\n\nEND - *********************** %d PRF CHANGES in %s\n", n - 1, theInput);
}

/// "ChannelInfo.PRF" keeps its element count (at least one) and its other elements; element 0
/// takes "ChannelInfo.PRFExtracted"[0].
void setPrfFromExtracted(CDescriptionHeader& theHeader)
{
    CDescriptionField& aPrf = theHeader["ChannelInfo.PRF"];
    std::vector<double> aOld;
    for (int i = 0; i < (aPrf.isInitialised() ? aPrf.getNbrOfElements() : 0); ++i)
        aOld.push_back(aPrf.isSet(0, i) ? aPrf.getDouble(i) : 0.0);
    const int aCount = aOld.empty() ? 1 : static_cast<int>(aOld.size());
    const double aExtracted = theHeader["ChannelInfo.PRFExtracted"].getDouble(0);
    aPrf.resize(1, aCount);
    for (int i = 1; i < aCount; ++i) aPrf.setValue(i, aOld[static_cast<std::size_t>(i)]);
    aPrf.setValue(0, aExtracted);
}

/// The header as it came is kept once, as a byte copy of the file that was read ("<input>.sml" to
/// "<input>_old.sml", an old text "<input>_hdr" to "<input>_old_hdr"), before anything rewrites it.
void keepOriginalHeader(const std::string& theInput)
{
    if (fqorvFileExists(theInput + "_old_hdr") || fqorvFileExists(theInput + "_old.sml")) return;
    const bool aXml = fqorvFileExists(theInput + ".sml");
    const std::string aFrom = theInput + (aXml ? ".sml" : "_hdr");
    const std::string aTo = theInput + (aXml ? "_old.sml" : "_old_hdr");
    if (!fqorvCopyAtomically(aFrom, aTo)) QORV_FATAL(CQORV_ERR_WRITE_FILE, aTo.c_str());
}

}  // namespace

void fdfExtractPrfChanges(const char* theInput)
{
    const std::string aInput = theInput ? theInput : "";
    const std::string aHeaderName = aInput + "_hdr";
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    if (!aHeader->read(aHeaderName.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, aHeaderName.c_str());
    }
    const int aSensor = fqorvSensorStrToID((*aHeader)["Sensor.SensorName"].getString());
    if (aSensor == CSAR_SENSOR_ENVISAT1_ID) return;

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(*aHeader, aInput.c_str(), aParam);
    // A raster whose lines carry no PRI code (an SLC given for multi-looking) has nothing to scan.
    if (aParam.mRowPrefix < CQORV_PRI_CODE_POS + 2) {
        fdfTrace("\nExtract PRF: row prefix of %d bytes holds no PRI code in %s\n", aParam.mRowPrefix, aInput.c_str());
        return;
    }
    fdfTrace("\nceos_envisat_raw_data_parameters\n");
    CRasterFile aRaster;
    aRaster.openRead(aParam);

    keepOriginalHeader(aInput);
    setPrfFromExtracted(*aHeader);

    fdfSetTitle("Extract PRF");
    getAndSetPerc(-1, 0, fdfGetTitle());
    const bool aSwap = aParam.mByteOrderMSBF != (std::endian::native == std::endian::big);
    const CDescriptionField& aRate = (*aHeader)["ChannelInfo.SamplingRate"];
    const double aSamplingRate = aRate.isInitialised() ? aRate.getDouble(0) : 0.0;
    const std::vector<CPrfSegment> aSegments = scanLines(aRaster, aSwap, aSensor, aSamplingRate);
    recordSegments(*aHeader, aSegments, aInput.c_str());
    aRaster.close();
    if (!aHeader->write(aHeaderName.c_str(), false, false)) QORV_FATAL(CQORV_ERR_WRITE_FILE, aHeaderName.c_str());
}
