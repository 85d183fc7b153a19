// ERS-1/2 level 0 in the ENVISAT format (.E1, .E2): the main product header (MPH), the specific
// product header (SPH) with its data set descriptors (DSDs), and the source packets, one data set
// record (DSR) per line.
//
// The headers are read by key (qorv_envisat_headers.h). The format states none of the radar
// values: they stay NaN and the ERS constants serve.
#include <cstdint>
#include <string>

#include "qorv_date.h"
#include "qorv_envisat_headers.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"
#include "qorv_native_reader.h"

namespace {

/// The ERS DSR: 11498 bytes, its own length the ISP length at 24 plus 33, the auxiliary block
/// with the image format counter at 54, the samples from 266.
constexpr uint32_t CQORV_ERS_DSR_BYTES = 11498;
constexpr int CQORV_ERS_DSR_COUNTER = 54;
constexpr uint32_t CQORV_ERS_DSR_SAMPLES = 266;

/// The sensor of the product name: ERS level 0 ("SAR_IM__0P...") ends in ".E1" or ".E2". ASAR
/// level 0 has a reader of its own; other ASAR products are no raw data.
std::string sensorOfProduct(const std::string& theProduct, const std::string& theFile)
{
    if (theProduct.rfind("ASA_", 0) == 0)
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theFile + " is the ENVISAT ASAR product " + theProduct + ", not raw data");
    const std::string aEnd = theProduct.size() >= 3 ? theProduct.substr(theProduct.size() - 3) : "";
    if (theProduct.rfind("SAR_IM__0", 0) != 0 || (aEnd != ".E1" && aEnd != ".E2"))
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theFile + " is the ENVISAT-format product '" + theProduct +
                                                            "', not ERS level 0 raw data (SAR_IM__0P ... .E1 or .E2)");
    return aEnd == ".E1" ? "ERS-1" : "ERS-2";
}

/// Identity, clock, scene times and the one state vector of the main product header.
void readMainHeader(const CEnvisatKeyValues& theMph, CNativeArchive& theArchive)
{
    fqorvReadEnvisatIdentity(theMph, theArchive);
    theArchive.mSensor = sensorOfProduct(theArchive.mProductName, theArchive.mFiles.front().string());

    // The clock: the UTC at which the satellite binary time read its stated count.
    const CQorvDate aClockDate = theMph.date("UTC_SBT_TIME");
    theArchive.mReferenceDay = aClockDate.dayNumber();
    theArchive.mClock.mReferenceTime = aClockDate.secondsOfDay();
    theArchive.mClock.mReferenceTicks = static_cast<uint32_t>(theMph.integer("SAT_BINARY_TIME"));
    theArchive.mClock.mTickSeconds = theMph.has("CLOCK_STEP") ? theMph.number("CLOCK_STEP") * 1.0e-12 : NQORV_ERS::CLOCK_TICK;
    if (!(theArchive.mClock.mTickSeconds > 0.0))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, theMph.name() + ": CLOCK_STEP '" + theMph.text("CLOCK_STEP") + "' ps");
    theArchive.mSensingStart = theMph.time("SENSING_START", theArchive.mReferenceDay);

    theArchive.mStateVectors = {fqorvEnvisatStateVector(theMph, theArchive.mReferenceDay)};
    theArchive.mStateVectorSource = "main product header (" + theMph.text("VECTOR_SOURCE") + ")";
}

/// Where the packets stand: the layout of the ERS DSR.
void readPacketLayout(const CEnvisatKeyValues& theDsd, CNativeArchive& theArchive)
{
    const std::string aName = theArchive.mFiles.front().filename().string();
    const int64_t aDsrSize = theDsd.integer("DSR_SIZE");
    const int64_t aCount = theDsd.integer("NUM_DSR");
    const std::string aLengths = "records of " + std::to_string(aDsrSize) + " bytes";
    if (aDsrSize != CQORV_ERS_DSR_BYTES)
        fqorvImportFail(CQORV_ERR_IMPORT_LAYOUT, aName + ": SAR_SOURCE_PACKETS of " + aLengths + ", the ERS layout has " +
                                                     std::to_string(CQORV_ERS_DSR_BYTES));
    // Divided rather than multiplied: a record count of a broken header overflows the product.
    if (theDsd.has("DS_SIZE") &&
        (theDsd.integer("DS_SIZE") % aDsrSize != 0 || theDsd.integer("DS_SIZE") / aDsrSize != aCount))
        fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH, aName + ": SAR_SOURCE_PACKETS of " +
                                                            std::to_string(theDsd.integer("DS_SIZE")) + " bytes hold not " +
                                                            std::to_string(aCount) + " " + aLengths);
    const int64_t aOffset = theDsd.integer("DS_OFFSET");
    if (aOffset < static_cast<int64_t>(CQORV_ENVISAT_MPH_BYTES))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE,
                        aName + ": SAR_SOURCE_PACKETS at byte " + std::to_string(aOffset) + ", inside the headers");

    CNativeRecordLayout& aLayout = theArchive.mLayout;
    aLayout.mDataFile = theArchive.mFiles.front();
    aLayout.mFirstRecord = static_cast<uint64_t>(aOffset);
    aLayout.mRecordLength = CQORV_ERS_DSR_BYTES;
    aLayout.mLengthPos = 24;   // the ISP length, which counts from byte 33 of the record
    aLayout.mLengthBytes = 2;
    aLayout.mLengthAdd = 33;
    aLayout.mSamplesPos = CQORV_ERS_DSR_SAMPLES;
    aLayout.mSamples = static_cast<int>((CQORV_ERS_DSR_BYTES - CQORV_ERS_DSR_SAMPLES) / 2);
    aLayout.mDeclaredRecords = aCount > 0 ? static_cast<uint64_t>(aCount) : 0;
    fqorvSetErsAuxPositions(aLayout, CQORV_ERS_DSR_COUNTER);
    theArchive.mLayoutName = "ENVISAT format";
    fqorvCountRecords(theArchive);
    fqorvCheckFirstRecords(aLayout, "ENVISAT format (" + aLengths + ")");
}

}  // namespace

CNativeArchive fqorvReadErsEnvisat(const std::filesystem::path& theFile)
{
    CNativeArchive aArchive;
    aArchive.mFormat = "ERS ENVISAT format";
    aArchive.mFiles = {theFile};
    const CEnvisatHeaders aHeaders = fqorvReadEnvisatHeaders(theFile);
    readMainHeader(aHeaders.mMph, aArchive);
    aArchive.mPolarisation = fqorvEnvisatPolarisation(aHeaders.mSph, aArchive.mPolarisation);
    readPacketLayout(aHeaders.descriptor("SAR_SOURCE_PACKETS"), aArchive);
    aArchive.mNotes.push_back("one state vector from the main product header (" + aHeaders.mMph.text("VECTOR_SOURCE") + ")");
    return aArchive;
}
