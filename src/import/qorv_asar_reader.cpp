// ENVISAT ASAR image mode level 0: not imported yet.
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"

CNativeArchive fqorvReadAsarEnvisat(const std::filesystem::path& theFile, const CNativeOutsideFiles&)
{
    fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theFile.string() + ": ENVISAT ASAR level 0 is not imported yet");
}

std::vector<CRecordCodes> fqorvScanAsarPackets(int, const CNativeRecordLayout& theLayout, const std::function<void(int)>&)
{
    fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theLayout.mDataFile.string() + ": ENVISAT ASAR level 0 is not imported yet");
}
