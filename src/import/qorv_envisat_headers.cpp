#include "qorv_envisat_headers.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>

#include "qorv_import_failure.h"
#include "qorv_native_formats.h"

namespace {

/// The text between the quotes without its padding, or the number without its unit.
std::string valueOf(const std::string& theRaw)
{
    std::string aValue = theRaw;
    if (!aValue.empty() && aValue[0] == '"') {
        const std::size_t aClose = aValue.find('"', 1);
        aValue = aValue.substr(1, aClose == std::string::npos ? std::string::npos : aClose - 1);
    } else {
        aValue = aValue.substr(0, aValue.find('<'));
    }
    const std::size_t aFirst = aValue.find_first_not_of(" \r\t");
    const std::size_t aLast = aValue.find_last_not_of(" \r\t");
    return aFirst == std::string::npos ? std::string() : aValue.substr(aFirst, aLast - aFirst + 1);
}

}  // namespace

CEnvisatKeyValues::CEnvisatKeyValues(const std::vector<uint8_t>& theBytes, std::size_t theBegin, std::size_t theEnd,
                                     std::string theName)
    : mName(std::move(theName))
{
    const std::string aText(theBytes.begin() + static_cast<std::ptrdiff_t>(std::min(theBegin, theBytes.size())),
                            theBytes.begin() + static_cast<std::ptrdiff_t>(std::min(theEnd, theBytes.size())));
    std::size_t aLine = 0;
    while (aLine < aText.size()) {
        std::size_t aEnd = aText.find('\n', aLine);
        if (aEnd == std::string::npos) aEnd = aText.size();
        const std::size_t aEqual = aText.find('=', aLine);
        if (aEqual < aEnd) mValues[aText.substr(aLine, aEqual - aLine)] = valueOf(aText.substr(aEqual + 1, aEnd - aEqual - 1));
        aLine = aEnd + 1;
    }
}

std::string CEnvisatKeyValues::text(const std::string& theKey) const
{
    const auto aFound = mValues.find(theKey);
    if (aFound == mValues.end()) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + " has no " + theKey);
    return aFound->second;
}

double CEnvisatKeyValues::number(const std::string& theKey) const
{
    const std::string aText = text(theKey);
    char* aEnd = nullptr;
    const double aValue = std::strtod(aText.c_str(), &aEnd);
    if (aText.empty() || *aEnd != '\0' || !std::isfinite(aValue))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + ": " + theKey + " '" + aText + "' is not a number");
    return aValue;
}

int64_t CEnvisatKeyValues::integer(const std::string& theKey) const
{
    const double aValue = number(theKey);
    // Beyond 2^53 a double no longer holds every integer, and beyond 2^63 the conversion is
    // undefined: no count, size or offset of a product comes near either.
    if (aValue != std::floor(aValue) || std::fabs(aValue) > 9007199254740992.0)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + ": " + theKey + " '" + text(theKey) + "' is not an integer up to 2^53");
    return static_cast<int64_t>(aValue);
}

CQorvDate CEnvisatKeyValues::date(const std::string& theKey) const
{
    CQorvDate aDate;
    const std::string aText = text(theKey);
    if (!aDate.parse(aText.c_str()))
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mName + ": " + theKey + " '" + aText + "' is not a date");
    return aDate;
}

double CEnvisatKeyValues::time(const std::string& theKey, long theReferenceDay) const
{
    const CQorvDate aDate = date(theKey);
    return static_cast<double>(aDate.dayNumber() - theReferenceDay) * 86400.0 + aDate.secondsOfDay();
}

std::vector<CEnvisatKeyValues> CEnvisatHeaders::descriptors() const
{
    const int64_t aCount = mMph.integer("NUM_DSD");
    const int64_t aSize = mMph.integer("DSD_SIZE");
    const auto aSphSize = static_cast<int64_t>(mSphSize);
    // Each count on its own within the header before their product, which could overflow.
    if (aCount < 1 || aSize < 1 || aCount > aSphSize || aSize > aSphSize || aCount * aSize > aSphSize)
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mFile + ": " + std::to_string(aCount) + " data set descriptors of " +
                                                    std::to_string(aSize) + " bytes do not fit a specific product header of " +
                                                    std::to_string(aSphSize));
    const int64_t aFirst = static_cast<int64_t>(CQORV_ENVISAT_MPH_BYTES) + aSphSize - aCount * aSize;
    std::vector<CEnvisatKeyValues> aDescriptors;
    for (int64_t i = 0; i < aCount; ++i) {
        const std::size_t aBegin = static_cast<std::size_t>(aFirst + i * aSize);
        aDescriptors.emplace_back(mBytes, aBegin, aBegin + static_cast<std::size_t>(aSize),
                                  mFile + " data set descriptor " + std::to_string(i + 1));
    }
    return aDescriptors;
}

CEnvisatKeyValues CEnvisatHeaders::descriptor(const std::string& theName) const
{
    for (const CEnvisatKeyValues& aDsd : descriptors())
        if (aDsd.has("DS_NAME") && aDsd.text("DS_NAME") == theName) return aDsd;
    fqorvImportFail(CQORV_ERR_IMPORT_VALUE, mFile + " has no data set " + theName);
}

CEnvisatHeaders fqorvReadEnvisatHeaders(const std::filesystem::path& theFile)
{
    CEnvisatHeaders h;
    h.mFile = theFile.filename().string();
    h.mBytes = fqorvReadFileBytes(theFile, 0, CQORV_ENVISAT_MPH_BYTES);
    h.mMph = CEnvisatKeyValues(h.mBytes, 0, CQORV_ENVISAT_MPH_BYTES, h.mFile + " main product header");
    const int64_t aSphSize = h.mMph.integer("SPH_SIZE");
    if (aSphSize < 1 || aSphSize > (1 << 24)) fqorvImportFail(CQORV_ERR_IMPORT_VALUE, h.mFile + ": SPH_SIZE " + std::to_string(aSphSize));
    h.mSphSize = static_cast<std::size_t>(aSphSize);
    h.mBytes = fqorvReadFileBytes(theFile, 0, CQORV_ENVISAT_MPH_BYTES + h.mSphSize);
    h.mSph = CEnvisatKeyValues(h.mBytes, CQORV_ENVISAT_MPH_BYTES, h.mBytes.size(), h.mFile + " specific product header");
    return h;
}

std::string fqorvEnvisatProductName(const std::filesystem::path& theFile)
{
    // The first line: PRODUCT="" and a name of 62 characters.
    std::vector<uint8_t> aHead;
    try {
        aHead = fqorvReadFileBytes(theFile, 0, 80);
    } catch (const CImportFailure&) {
        return "";
    }
    if (aHead.size() < 9 || std::memcmp(aHead.data(), "PRODUCT=", 8) != 0) return "";
    const CEnvisatKeyValues aLine(aHead, 0, aHead.size(), theFile.filename().string());
    return aLine.has("PRODUCT") ? aLine.text("PRODUCT") : "";
}

std::string fqorvEnvisatPolarisation(const CEnvisatKeyValues& theSph, const std::string& theDefault)
{
    if (!theSph.has("TX_RX_POLAR")) return theDefault;
    std::string aPolarisation;
    for (const char c : theSph.text("TX_RX_POLAR"))
        if (c == 'H' || c == 'V') aPolarisation += c;
    return aPolarisation.size() == 2 ? aPolarisation : theDefault;
}

void fqorvReadEnvisatIdentity(const CEnvisatKeyValues& theMph, CNativeArchive& theArchive)
{
    theArchive.mProductName = theMph.text("PRODUCT");
    theArchive.mFacility = theMph.text("PROC_CENTER");
    theArchive.mProcessor = theMph.text("SOFTWARE_VER");
    const int64_t aOrbit = theMph.integer("ABS_ORBIT");
    theArchive.mOrbit = aOrbit > 0 ? static_cast<int>(aOrbit) : -1;
}

CStateVector fqorvEnvisatStateVector(const CEnvisatKeyValues& theMph, long theReferenceDay)
{
    CStateVector aVector;
    aVector.mTime = theMph.time("STATE_VECTOR_TIME", theReferenceDay);
    const char* aAxes[3] = {"X", "Y", "Z"};
    for (int i = 0; i < 3; ++i) {
        aVector.mPosition[i] = theMph.number(std::string(aAxes[i]) + "_POSITION");
        aVector.mVelocity[i] = theMph.number(std::string(aAxes[i]) + "_VELOCITY");
    }
    return aVector;
}
