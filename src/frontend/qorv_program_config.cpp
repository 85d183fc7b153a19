#include "qorv_program_config.h"

#include <cstdlib>
#include <stdexcept>
#include <vector>

namespace qfocus {

namespace fs = std::filesystem;

fs::path findConfiguration(const fs::path& theGiven, const fs::path& theExeDir)
{
    std::vector<fs::path> aPlaces;
    if (!theGiven.empty()) aPlaces.push_back(theGiven);
    if (const char* e = std::getenv("QORVEX_INIT_DIR"); e && *e) aPlaces.emplace_back(e);
    aPlaces.push_back(theExeDir.parent_path() / "etc");
#ifdef QORVEX_BUILD_ETC
    aPlaces.emplace_back(QORVEX_BUILD_ETC);
#endif
    std::error_code e;
    for (const fs::path& p : aPlaces)
        if (fs::is_regular_file(p / "Qorvex_configuration.ini", e)) return fs::absolute(p);
    throw std::invalid_argument("no Qorvex_configuration.ini found (give --config DIR, or write one with qorvex-make-config)");
}

}  // namespace qfocus
