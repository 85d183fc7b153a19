// ALOS PALSAR level 1.0: not imported yet.
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"

CNativeArchive fqorvReadAlosCeos(const std::filesystem::path& theLeader, const std::filesystem::path&)
{
    fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theLeader.string() + ": ALOS PALSAR level 1.0 is not imported yet");
}

std::vector<CRecordCodes> fqorvScanAlosRecords(int, const CNativeRecordLayout& theLayout, const std::function<void(int)>&)
{
    fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theLayout.mDataFile.string() + ": ALOS PALSAR level 1.0 is not imported yet");
}
