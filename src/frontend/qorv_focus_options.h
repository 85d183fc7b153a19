// The command line of qorvex-focus: named options with the chain's defaults, checked before
// anything runs, and the driver's arguments file that they stand for.
#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace qfocus {

namespace fs = std::filesystem;

struct Options {
    std::vector<fs::path> mRaw;     // raw products and native archives, as given
    fs::path mOut = ".";            // output directory
    int mRangeLooks = 1;
    int mAzimuthLooks = 5;
    bool mMultiLook = true;
    bool mTiff = true;
    bool mKeepIntermediate = false;
    bool mSkip[4] = {false, false, false, false};  // steps 0 to 3
    bool mAmbiguity = true;
    int mDopplerDegree = 1;
    std::string mAzimuth = "precise";  // azimuth mode of the omega-k step: precise or block
    int mJobs = 1;
    fs::path mJson;                 // summary for scripts; empty: none
    fs::path mConfig;               // directory of Qorvex_configuration.ini; empty: found
    fs::path mOrbit;                // outside orbit for the archives' import; empty: none
    fs::path mAux;                  // outside instrument file for the archives' import; empty: none
    bool mHelp = false;
};

/// Parses argv; throws std::invalid_argument with a sentence for the user on a bad option, a
/// missing value, an input that does not exist, or two raw products that would share one output
/// root (the names of an archive's products are known once it is read).
Options parseOptions(int argc, const char* const* argv);

/// The --help text: every option with its default.
std::string helpText();

/// Name of a scene's products: the raw file's name without a trailing "_raw".
std::string sceneBase(const fs::path& theRaw);

/// True when theInput is a raw product (its header theInput.sml beside it, or a name ending in
/// "_raw"); otherwise it is taken for a native archive, which qorvex-import reads.
bool isRawProduct(const fs::path& theInput);

/// The driver's arguments file for one scene: a free first line, the nineteen arguments and the
/// azimuth degree of the Doppler table. theRaw is the raw product in the output directory, theRoot
/// the output root (the products are theRoot + "_slc", "_pwr", ...).
std::string argumentsFile(const Options& theOptions, const fs::path& theRaw, const fs::path& theRoot);

}  // namespace qfocus
