// The header chain of a list of products.
#include "qorv_header_chain.h"

#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"

namespace {

std::string fJoin(const char* theRoot, const char* theSuffix)
{
    return std::string(theRoot ? theRoot : "") + (theSuffix ? theSuffix : "");
}

/// Reads a full header or fails with 261122 and the name.
std::unique_ptr<CDescriptionHeader> fReadFull(const std::string& theName)
{
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    if (!aHeader->read(theName.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", theName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, theName.c_str());
    }
    return aHeader;
}

void fWriteFull(CDescriptionHeader& theHeader, const std::string& theName)
{
    if (!theHeader.write(theName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", theName.c_str());
        QORV_FATAL(CQORV_ERR_WRITE_FILE, theName.c_str());
    }
}

}  // namespace

void fdfCopyHeader(const char* theSource, const char* theTarget, const char* theSuffix)
{
    std::unique_ptr<CDescriptionHeader> aHeader = fReadFull(fJoin(theSource, theSuffix));
    fWriteFull(*aHeader, fJoin(theTarget, theSuffix));
}

void fdfInheritHeader(const char* theSource, const char* theTarget, const char* theSuffix)
{
    const std::string aTargetName = fJoin(theTarget, theSuffix) + "_hdr";
    std::unique_ptr<CDescriptionHeader> aSource = fReadFull(fJoin(theSource, theSuffix) + "_hdr");
    std::unique_ptr<CDescriptionHeader> aTarget = fReadFull(aTargetName);

    // The target keeps its own channel: the first polarisation and the channel processed.
    const CDescriptionField& aTargetDescription = (*aTarget)["ChannelInfo.Description"];
    if (aTargetDescription.isInitialised() && aTargetDescription.isSet(0, 0)) {
        CDescriptionField& aDescription = (*aSource)["ChannelInfo.Description"];
        if (aDescription.isEmpty()) aDescription.resize(1, 1);
        aDescription.setValue(0, aTargetDescription.getString(0));
    }
    const CDescriptionField& aTargetChannel = (*aTarget)["sar_processing.Channel"];
    if (aTargetChannel.isInitialised()) (*aSource)["sar_processing.Channel"].setValue(aTargetChannel.getString());
    fWriteFull(*aSource, aTargetName);
}
