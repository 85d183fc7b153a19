// The ASAR instrument file (ASA_INS_AX): its headers tell what it is and when it applies, its one
// data set the values the import takes (offsets in qorv_asar_instrument.h).
#include "qorv_asar_instrument.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <string>
#include <system_error>

#include "qorv_ceos_records.h"
#include "qorv_envisat_headers.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"

namespace {

constexpr const char* CQORV_INSTRUMENT_PRODUCT = "ASA_INS_AX";
constexpr std::size_t CQORV_TABLE_VALUES = 4096;

// Offsets within the data set.
constexpr std::size_t CQORV_INS_RADAR_FREQUENCY = 16;
constexpr std::size_t CQORV_INS_SAMPLING_RATE = 20;
constexpr std::size_t CQORV_INS_RANGE_GATE_BIAS = 69912;
constexpr std::size_t CQORV_INS_FBAQ_I = 74656;
constexpr std::size_t CQORV_INS_FBAQ_Q = 103328;
constexpr std::size_t CQORV_INS_TIMELINE = 161594;   // rows swath, m, r, g of 7 u16 each
constexpr std::size_t CQORV_INS_TIMELINE_RANK_ROW = 2;

float bigEndianFloat(const uint8_t* theBytes)
{
    const uint32_t aBits = fqorvBigEndianU32(theBytes);
    float aValue;
    std::memcpy(&aValue, &aBits, sizeof aValue);
    return aValue;
}

[[noreturn]] void failKind(const std::filesystem::path& theFile, const std::string& theWhy)
{
    fqorvImportFail(CQORV_ERR_IMPORT_OUTSIDE_KIND, theFile.string() + " " + theWhy + ": not an ASAR instrument file ASA_INS_AX");
}

std::vector<float> readTable(const std::vector<uint8_t>& theData, std::size_t theAt, const std::filesystem::path& theFile,
                             const char* theName)
{
    std::vector<float> aTable(CQORV_TABLE_VALUES);
    for (std::size_t i = 0; i < CQORV_TABLE_VALUES; ++i) {
        aTable[i] = bigEndianFloat(theData.data() + theAt + 4 * i);
        if (!std::isfinite(aTable[i]))
            failKind(theFile, "holds a value that is not a number in its FBAQ table of " + std::string(theName) + " (entry " +
                                  std::to_string(i) + ")");
    }
    return aTable;
}

}  // namespace

bool fqorvIsAsarInstrumentFile(const std::filesystem::path& theFile)
{
    return fqorvEnvisatProductName(theFile).rfind(CQORV_INSTRUMENT_PRODUCT, 0) == 0;
}

CAsarInstrument fqorvReadAsarInstrument(const std::filesystem::path& theFile, long theReferenceDay)
{
    std::error_code aError;
    if (!std::filesystem::exists(theFile, aError)) fqorvImportFail(CQORV_ERR_MISSING_FILE, theFile.string() + " does not exist");
    const std::string aProduct = fqorvEnvisatProductName(theFile);
    if (aProduct.empty()) failKind(theFile, "is no ENVISAT-format product");
    if (aProduct.rfind(CQORV_INSTRUMENT_PRODUCT, 0) != 0) failKind(theFile, "is the product " + aProduct);

    CAsarInstrument aInstrument;
    aInstrument.mFile = theFile;
    std::vector<uint8_t> aData;
    try {
        // A header that does not read makes the file as useless as one of another kind.
        const CEnvisatHeaders aHeaders = fqorvReadEnvisatHeaders(theFile);
        aInstrument.mValidityStart = aHeaders.mMph.time("SENSING_START", theReferenceDay);
        aInstrument.mValidityStop = aHeaders.mMph.time("SENSING_STOP", theReferenceDay);
        const uint64_t aSize = std::filesystem::file_size(theFile, aError);
        if (aError || aSize != aHeaders.headersEnd() + NQORV_ASAR::INSTRUMENT_FILE_SIZE)
            failKind(theFile, "holds " + std::to_string(aSize - std::min(aSize, aHeaders.headersEnd())) + " bytes behind its headers, not " +
                                  std::to_string(NQORV_ASAR::INSTRUMENT_FILE_SIZE));
        aData = fqorvReadFileBytes(theFile, aHeaders.headersEnd(), NQORV_ASAR::INSTRUMENT_FILE_SIZE);
    } catch (const CImportFailure& e) {
        if (e.id() != CQORV_ERR_IMPORT_VALUE) throw;
        failKind(theFile, std::string("has headers that can't be read (") + e.parameter() + ")");
    }
    if (aData.size() != static_cast<std::size_t>(NQORV_ASAR::INSTRUMENT_FILE_SIZE)) failKind(theFile, "ends early");

    aInstrument.mRadarFrequency = bigEndianFloat(aData.data() + CQORV_INS_RADAR_FREQUENCY);
    aInstrument.mSamplingRate = bigEndianFloat(aData.data() + CQORV_INS_SAMPLING_RATE);
    aInstrument.mRangeGateBias = bigEndianFloat(aData.data() + CQORV_INS_RANGE_GATE_BIAS);
    // C band is 4 to 8 GHz; the bias is a delay of the instrument, far below a pulse interval.
    if (!(aInstrument.mRadarFrequency > 4e9 && aInstrument.mRadarFrequency < 8e9))
        failKind(theFile, "states a radar frequency of " + std::to_string(aInstrument.mRadarFrequency) + " Hz");
    if (!(aInstrument.mSamplingRate > 1e6 && aInstrument.mSamplingRate < 100e6))
        failKind(theFile, "states a sampling rate of " + std::to_string(aInstrument.mSamplingRate) + " Hz");
    if (!(std::fabs(aInstrument.mRangeGateBias) < 1e-4))
        failKind(theFile, "states a range gate bias of " + std::to_string(aInstrument.mRangeGateBias) + " s");
    aInstrument.mFbaq.mI = readTable(aData, CQORV_INS_FBAQ_I, theFile, "I");
    aInstrument.mFbaq.mQ = readTable(aData, CQORV_INS_FBAQ_Q, theFile, "Q");
    for (std::size_t k = 0; k < aInstrument.mRank.size(); ++k) {
        const int aRank = fqorvBigEndianU16(aData.data() + CQORV_INS_TIMELINE + 2 * (7 * CQORV_INS_TIMELINE_RANK_ROW + k));
        if (aRank < 1 || aRank > 15)
            failKind(theFile, "states a rank of " + std::to_string(aRank) + " for the beam set IS" + std::to_string(k + 1));
        aInstrument.mRank[k] = aRank;
    }
    return aInstrument;
}
