// Where the programs for people find the system's configuration.
#pragma once

#include <filesystem>

namespace qfocus {

/// The directory of Qorvex_configuration.ini: theGiven (a --config option) when not empty, else
/// $QORVEX_INIT_DIR, else the install's etc/ beside theExeDir's bin/, else the build tree's.
/// Throws std::invalid_argument with a sentence for the user when none holds the file.
std::filesystem::path findConfiguration(const std::filesystem::path& theGiven, const std::filesystem::path& theExeDir);

}  // namespace qfocus
