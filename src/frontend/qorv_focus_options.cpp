#include "qorv_focus_options.h"

#include <charconv>
#include <set>
#include <stdexcept>

namespace qfocus {

namespace {

int toInt(const std::string& theText, const std::string& theOption, int theLow, int theHigh)
{
    int v = 0;
    const auto [aEnd, aError] = std::from_chars(theText.data(), theText.data() + theText.size(), v);
    if (aError != std::errc() || aEnd != theText.data() + theText.size() || v < theLow || v > theHigh)
        throw std::invalid_argument(theOption + " wants a whole number from " + std::to_string(theLow) + " to " +
                                    std::to_string(theHigh) + ", not \"" + theText + "\"");
    return v;
}

const char* ok(bool b) { return b ? "OK" : "NotOK"; }

}  // namespace

std::string helpText()
{
    return "usage: qorvex-focus [options] INPUT [INPUT ...]\n"
           "\n"
           "Focuses each INPUT through the whole chain: parameters, Doppler centroid, range compression,\n"
           "Doppler ambiguity, three autofocus runs, omega-k focusing, multi-look and TIFF. An INPUT is a raw\n"
           "product (a raw raster RAW with its header RAW.sml) or a native archive that qorvex-import reads\n"
           "(an ERS CEOS product directory, its data or leader file, an ERS .E1/.E2 file): each product of\n"
           "the archive is imported into its scene's work directory and focused as a scene of its own. Inputs\n"
           "are only read: each scene runs on a copy of its header in the output directory.\n"
           "\n"
           "Options (default in brackets):\n"
           "  --out DIR              output directory; a scene's products are DIR/NAME_slc, _pwr, ... where NAME is\n"
           "                         the raw file's name without \"_raw\", or the product's name of the import [.]\n"
           "  --looks RxA            range x azimuth looks of the multi-look step [1x5]\n"
           "  --no-multilook         make the SLC only [multi-look on]\n"
           "  --no-tiff              no TIFF renditions [TIFF on]\n"
           "  --keep                 keep the intermediate rasters (range compressed data, looks) [deleted]\n"
           "  --skip STEP            skip step 0 (parameters), 1 (Doppler centroid), 2 (range compression) or\n"
           "                         3 (autofocus); repeatable [none]\n"
           "  --no-ambiguity         no Doppler ambiguity resolution [on]\n"
           "  --doppler-degree N     azimuth degree of the Doppler table, 0 to 5 [1]\n"
           "  --azimuth MODE         omega-k focusing: precise (each range column at its own effective velocity\n"
           "                         from the orbit) or block (one velocity per block) [precise]\n"
           "  --jobs N               scenes focused at once [1]\n"
           "  --json FILE            write the summary as JSON to FILE [none]\n"
           "  --orbit FILE           state vectors for the archives' import (qorvex-import --help) [the archive's]\n"
           "  --aux FILE             instrument file for the archives' import [none]\n"
           "  --config DIR           directory of Qorvex_configuration.ini [$QORVEX_INIT_DIR, else the\n"
           "                         install's etc/, else the build tree's]\n"
           "  --help                 this text\n"
           "\n"
           "Exit status: 0 when every scene succeeded, 1 when a scene failed or was stopped, 2 on a bad command\n"
           "line (nothing runs). Ctrl-C stops the runs through the focuser's operator stop; a second Ctrl-C\n"
           "ends them at once.\n";
}

std::string sceneBase(const fs::path& theRaw)
{
    std::string aName = theRaw.filename().string();
    if (aName.size() > 4 && aName.compare(aName.size() - 4, 4, "_raw") == 0) aName.resize(aName.size() - 4);
    return aName;
}

bool isRawProduct(const fs::path& theInput)
{
    std::error_code e;
    return fs::is_regular_file(theInput.string() + ".sml", e) || sceneBase(theInput) != theInput.filename().string();
}

Options parseOptions(int argc, const char* const* argv)
{
    Options o;
    auto value = [&](int& i, const std::string& theOption) -> std::string {
        if (i + 1 >= argc) throw std::invalid_argument(theOption + " wants a value");
        return argv[++i];
    };
    for (int i = 1; i < argc; ++i) {
        const std::string a = argv[i];
        if (a == "--help" || a == "-h") {
            o.mHelp = true;
        } else if (a == "--out") {
            o.mOut = value(i, a);
        } else if (a == "--looks") {
            const std::string v = value(i, a);
            const std::size_t x = v.find('x');
            if (x == std::string::npos) throw std::invalid_argument("--looks wants RANGExAZIMUTH, e.g. 1x5, not \"" + v + "\"");
            o.mRangeLooks = toInt(v.substr(0, x), a, 1, 1000);
            o.mAzimuthLooks = toInt(v.substr(x + 1), a, 1, 1000);
        } else if (a == "--no-multilook") {
            o.mMultiLook = false;
        } else if (a == "--no-tiff") {
            o.mTiff = false;
        } else if (a == "--keep") {
            o.mKeepIntermediate = true;
        } else if (a == "--skip") {
            o.mSkip[toInt(value(i, a), a, 0, 3)] = true;
        } else if (a == "--no-ambiguity") {
            o.mAmbiguity = false;
        } else if (a == "--doppler-degree") {
            o.mDopplerDegree = toInt(value(i, a), a, 0, 5);
        } else if (a == "--azimuth") {
            o.mAzimuth = value(i, a);
            if (o.mAzimuth != "precise" && o.mAzimuth != "block")
                throw std::invalid_argument("--azimuth wants precise or block, not \"" + o.mAzimuth + "\"");
        } else if (a == "--jobs") {
            o.mJobs = toInt(value(i, a), a, 1, 256);
        } else if (a == "--json") {
            o.mJson = value(i, a);
        } else if (a == "--config") {
            o.mConfig = value(i, a);
        } else if (a == "--orbit") {
            o.mOrbit = fs::absolute(value(i, a));
        } else if (a == "--aux") {
            o.mAux = fs::absolute(value(i, a));
        } else if (a.size() > 1 && a[0] == '-') {
            throw std::invalid_argument("unknown option " + a + " (qorvex-focus --help lists them)");
        } else {
            o.mRaw.emplace_back(a);
        }
    }
    if (o.mHelp) return o;
    if (o.mRaw.empty()) throw std::invalid_argument("no raw product or archive given (qorvex-focus --help)");
    o.mOut = fs::absolute(o.mOut).lexically_normal();  // the driver runs in the scene's working directory
    std::set<std::string> aBases;
    for (const fs::path& r : o.mRaw) {
        std::error_code e;
        if (!fs::exists(r, e)) throw std::invalid_argument("no raw product or archive " + r.string());
        if (!isRawProduct(r)) continue;
        if (!fs::is_regular_file(r, e)) throw std::invalid_argument("no raw file " + r.string());
        if (!aBases.insert(sceneBase(r)).second)
            throw std::invalid_argument("two raw products would write the same products " + (o.mOut / sceneBase(r)).string() +
                                        "_*: focus them into different --out directories");
    }
    return o;
}

std::string argumentsFile(const Options& o, const fs::path& theRaw, const fs::path& theRoot)
{
    const std::vector<std::string> aArgs = {
        theRaw.string(),                       // 0 input
        "OK",                                  // 1 focusing
        theRoot.string() + "_slc",             // 2 output root
        std::to_string(o.mRangeLooks),         // 3, 4 looks
        std::to_string(o.mAzimuthLooks),
        ok(o.mMultiLook),                      // 5 multi-look
        ok(o.mTiff),                           // 6 TIFF
        ok(!o.mKeepIntermediate),              // 7 intermediate files deleted
        "0.333",                               // 8 TIFF conversion argument
        "0",                                   // 9 multi-look argument
        ok(o.mAmbiguity),                      // 10 ambiguity resolution
        "NotOK",                               // 11 a missing input is a failure
        "NotOK",                               // 12 focusing step's last argument
        "NotOK",                               // 13 multi-look argument
        ok(o.mSkip[0]), ok(o.mSkip[1]), ok(o.mSkip[2]), ok(o.mSkip[3]),  // 14 - 17 skip steps 0 - 3
        "NotOK",                               // 18 multi-look argument
        std::to_string(o.mDopplerDegree),      // 19 azimuth degree of the Doppler table
    };
    std::string aText = "qorvex-focus: " + theRaw.filename().string() + "\n";
    for (const std::string& a : aArgs) aText += a + "\n";
    return aText;
}

}  // namespace qfocus
