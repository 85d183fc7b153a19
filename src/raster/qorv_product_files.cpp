// A product on disk: a raster with its header files, renamed or copied as one.
#include "qorv_product_files.h"

#include <filesystem>
#include <string>

#include "qorv_enviroment.h"
#include "qorv_errors.h"

namespace {

constexpr const char* CQORV_PRODUCT_SUFFIXES[] = {"", "_hdr", ".sml", ".hdr"};

}  // namespace

void fqorvRenameProduct(const char* theFrom, const char* theTo)
{
    for (const char* aSuffix : CQORV_PRODUCT_SUFFIXES) {
        const std::string aFrom = std::string(theFrom) + aSuffix;
        const std::string aTo = std::string(theTo) + aSuffix;
        if (!std::filesystem::exists(aFrom)) continue;
        std::error_code aError;
        std::filesystem::rename(aFrom, aTo, aError);
        if (aError) {
            fdfTrace("Error: can't rename %s to %s\n", aFrom.c_str(), aTo.c_str());
            QORV_FATAL(CQORV_ERR_CREATE_FILE, aTo.c_str());
        }
    }
}

void fqorvCopyProduct(const char* theFrom, const char* theTo)
{
    for (const char* aSuffix : CQORV_PRODUCT_SUFFIXES) {
        const std::string aFrom = std::string(theFrom) + aSuffix;
        const std::string aTo = std::string(theTo) + aSuffix;
        if (!std::filesystem::exists(aFrom)) continue;
        std::error_code aError;
        std::filesystem::copy_file(aFrom, aTo, std::filesystem::copy_options::overwrite_existing, aError);
        if (aError) {
            fdfTrace("Error: can't copy %s to %s\n", aFrom.c_str(), aTo.c_str());
            QORV_FATAL(CQORV_ERR_WRITE_FILE, aTo.c_str());
        }
    }
}
