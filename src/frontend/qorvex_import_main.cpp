// qorvex-import: native raw archives (ERS CEOS, ERS level 0 in the ENVISAT format) into raw
// products that the chain focuses. Each input is imported in turn; one that fails leaves no product
// and the others go on. What was written, and what was found and handled on the way, goes to
// standard output (and to --json); the failure id of the first failure, or the pseudo id of a run
// with warnings, ends standard error and sets the exit status, as the focuser's do.
#include <unistd.h>

#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <stdexcept>
#include <string>
#include <vector>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_import.h"
#include "qorv_import_failure.h"
#include "qorv_json.h"
#include "qorv_program_config.h"

namespace {

namespace fs = std::filesystem;

constexpr int CQORV_EXIT_USAGE = 2;

struct CImportOptions {
    std::vector<fs::path> mInputs;
    fs::path mOut = ".";
    fs::path mAux, mOrbit, mJson, mConfig;
    int64_t mFirst = 0, mCount = -1;
    bool mQuiet = false, mHelp = false;
};

const char* const CQORV_IMPORT_HELP =
    "usage: qorvex-import [options] INPUT [INPUT ...]\n"
    "\n"
    "Reads native raw archives and writes the raw products the chain focuses: for each product\n"
    "NAME_raw and its header NAME_raw.sml, NAME being the sensor, the date and time of the first line,\n"
    "the orbit and (ASAR, ALOS) the polarisation (ERS2_20020615_174928_o37112). INPUT is an ERS-1/2\n"
    "CEOS raw product (its directory, its data file or its leader file), an ERS level 0 file in the\n"
    "ENVISAT format (.E1, .E2), an ENVISAT ASAR image mode level 0 file (ASA_IM__0P, .N1) or an ALOS\n"
    "PALSAR level 1.0 product (its directory or leader: one product per polarisation; or one IMG-\n"
    "file); the format is told by the content. The archive is only read.\n"
    "\n"
    "Options (default in brackets):\n"
    "  --out DIR              directory of the products [.]\n"
    "  --orbit FILE           state vectors replacing the archive's: lines of\n"
    "                         \"YYYY-MM-DDThh:mm:ss.ffffff x y z vx vy vz\", Earth-fixed, m and m/s,\n"
    "                         or a DORIS orbit file (DOR_VOR_AX), which ASAR needs [ASAR: the one\n"
    "                         beside the product; else none]\n"
    "  --aux FILE             the instrument file ASA_INS_AX of an ASAR product [the one beside it;\n"
    "                         the other formats take none]\n"
    "  --lines FIRST:COUNT    import COUNT lines from line FIRST (from 0) of the data file [all]\n"
    "  --json FILE            write what was imported as JSON to FILE [none]\n"
    "  --config DIR           directory of Qorvex_configuration.ini [$QORVEX_INIT_DIR, else the\n"
    "                         install's etc/, else the build tree's]\n"
    "  --quiet                no progress on standard error\n"
    "  --help                 this text\n"
    "\n"
    "Exit status: 0 when every input was imported, 1 when one was imported with warnings, the primary\n"
    "code of the failure id when one failed (15 for the import's own ids, 4 for files), 2 on a bad\n"
    "command line. docs/importers.md lists the ids.\n";

int64_t wholeNumber(const std::string& theText, const std::string& theWhat)
{
    int64_t v = 0;
    const auto [aEnd, aError] = std::from_chars(theText.data(), theText.data() + theText.size(), v);
    if (aError != std::errc() || aEnd != theText.data() + theText.size() || v < 0)
        throw std::invalid_argument(theWhat + " wants a whole number, not \"" + theText + "\"");
    return v;
}

CImportOptions parseOptions(int argc, char** argv)
{
    CImportOptions o;
    auto value = [&](int& i, const std::string& theOption) -> std::string {
        if (i + 1 >= argc) throw std::invalid_argument(theOption + " wants a value");
        return argv[++i];
    };
    for (int i = 1; i < argc; ++i) {
        const std::string a = argv[i];
        if (a == "--help" || a == "-h") o.mHelp = true;
        else if (a == "--out") o.mOut = value(i, a);
        else if (a == "--aux") o.mAux = value(i, a);
        else if (a == "--orbit") o.mOrbit = value(i, a);
        else if (a == "--json") o.mJson = value(i, a);
        else if (a == "--config") o.mConfig = value(i, a);
        else if (a == "--quiet") o.mQuiet = true;
        else if (a == "--lines") {
            const std::string v = value(i, a);
            const std::size_t c = v.find(':');
            if (c == std::string::npos) throw std::invalid_argument("--lines wants FIRST:COUNT, e.g. 0:20000, not \"" + v + "\"");
            o.mFirst = wholeNumber(v.substr(0, c), "--lines");
            o.mCount = wholeNumber(v.substr(c + 1), "--lines");
            if (o.mCount == 0) throw std::invalid_argument("--lines wants a COUNT of at least 1");
        } else if (!a.empty() && a[0] == '-') throw std::invalid_argument("unknown option " + a + " (see --help)");
        else o.mInputs.emplace_back(a);
    }
    if (o.mInputs.empty() && !o.mHelp) throw std::invalid_argument("no INPUT given (see --help)");
    return o;
}

/// The catalogue's words of a failure or warning id.
std::string catalogueText(const CErrorCatalog& theCatalog, int theId)
{
    char p[CQORV_CATALOG_TEXT_LEN], s[CQORV_CATALOG_TEXT_LEN];
    theCatalog.getErrorText(theId, p, s);
    return std::string(p) + (s[0] ? std::string(": ") + s : "");
}

// ------------------------------------------------------------------------------------------------
// The report of one input

CJson warningsJson(const CImportReport& r)
{
    CJson w = CJson::array();
    for (const auto& [aId, aText] : r.mWarnings) {
        CJson x = CJson::object();
        x["id"] = aId;
        x["text"] = catalogueText(gWarningCatalog, aId);
        x["parameter"] = aText;
        w.push(x);
    }
    return w;
}

CJson productJson(const CImportedProduct& p)
{
    const CProductDescription& d = p.mDescription;
    CJson x = CJson::object();
    x["name"] = p.mName;
    x["raster"] = p.mRaster.string();
    x["header"] = p.mHeader.string();
    x["lines"] = static_cast<long long>(p.mLines);
    x["fill_lines"] = static_cast<long long>(p.mFillLines);
    x["pulses"] = static_cast<long long>(p.mPulses);
    x["input"] = p.mInput.string();
    x["first_record"] = static_cast<long long>(p.mFirstRecord);
    x["last_record"] = static_cast<long long>(p.mLastRecord);
    x["samples"] = d.mSamples;
    x["pri_code"] = p.mPriCode;
    x["prf_hz"] = d.mPrf;
    x["start_time"] = p.mStartTime;
    x["stop_time"] = p.mStopTime;
    x["time_source"] = p.mTimeSource;
    x["near_range_m"] = d.mNearRange;
    x["centre_latitude"] = d.mCentreLatitude;
    x["centre_longitude"] = d.mCentreLongitude;
    x["incidence_deg"] = d.mIncidenceDeg;
    x["processing_velocity_m_s"] = d.mProcessingVelocity;
    x["carrier_hz"] = d.mCarrier;
    x["orbit_source"] = d.mOrbitSource;
    x["state_vectors"] = static_cast<int>(d.mStateVectors.size());
    CJson& n = x["notes"] = CJson::array();
    for (const std::string& s : p.mNotes) n.push(s);
    return x;
}

CJson inputJson(const fs::path& theInput, const CImportReport* r, int theFailure, const std::string& theParameter)
{
    CJson j = CJson::object();
    j["input"] = theInput.string();
    if (r) {
        j["format"] = r->mFormat;
        j["sensor"] = r->mSensor;
        j["layout"] = r->mLayout;
        j["facility"] = r->mFacility;
        j["processor"] = r->mProcessor;
        j["archive_product"] = r->mProductName;
        j["orbit"] = r->mOrbit >= 0 ? CJson(r->mOrbit) : CJson();
        j["records"] = static_cast<long long>(r->mRecords);
        j["declared_records"] = static_cast<long long>(r->mDeclaredRecords);
        CJson& n = j["notes"] = CJson::array();
        for (const std::string& s : r->mNotes) n.push(s);
        j["warnings"] = warningsJson(*r);
        CJson& p = j["products"] = CJson::array();
        for (const CImportedProduct& x : r->mProducts) p.push(productJson(x));
    }
    if (theFailure != 0) {
        CJson f = CJson::object();
        f["id"] = theFailure;
        f["text"] = catalogueText(gErrorCatalog, theFailure);
        f["parameter"] = theParameter;
        j["failure"] = f;
    } else {
        j["failure"] = CJson();
    }
    return j;
}

void printReport(const CImportReport& r)
{
    // The format, its layout where the format has several, the facility and processor.
    std::vector<std::string> aWhat;
    if (r.mFormat.size() < r.mLayout.size() || r.mFormat.compare(r.mFormat.size() - r.mLayout.size(), r.mLayout.size(), r.mLayout) != 0)
        aWhat.push_back(r.mLayout);
    if (!r.mFacility.empty()) aWhat.push_back(r.mFacility + (r.mProcessor.empty() ? "" : " " + r.mProcessor));
    std::string aDetail;
    for (const std::string& x : aWhat) aDetail += (aDetail.empty() ? " (" : ", ") + x;
    if (!aDetail.empty()) aDetail += ")";
    std::printf("%s: %s%s, %s, %llu lines of %d samples\n", r.mSource.c_str(), r.mFormat.c_str(), aDetail.c_str(),
                r.mSensor.c_str(), static_cast<unsigned long long>(r.mRecords), r.mSamples);
    for (const std::string& n : r.mNotes) std::printf("  note: %s\n", n.c_str());
    for (const CImportedProduct& p : r.mProducts) {
        const CProductDescription& d = p.mDescription;
        std::printf("  %s: %lld lines (%lld filled), records %lld to %lld, PRF %.4f Hz, %s to %s\n", p.mRaster.c_str(),
                    static_cast<long long>(p.mLines), static_cast<long long>(p.mFillLines), static_cast<long long>(p.mFirstRecord),
                    static_cast<long long>(p.mLastRecord), d.mPrf, p.mStartTime.c_str(), p.mStopTime.c_str());
        std::printf("    near range %.3f km, centre %.4f %.4f deg, incidence %.2f deg, velocity %.2f m/s, orbit: %s\n",
                    d.mNearRange * 1e-3, d.mCentreLatitude, d.mCentreLongitude, d.mIncidenceDeg, d.mProcessingVelocity,
                    d.mOrbitSource.c_str());
        for (const std::string& n : p.mNotes) std::printf("    note: %s\n", n.c_str());
    }
    for (const auto& [aId, aText] : r.mWarnings)
        std::printf("  warning %d: %s: %s\n", aId, catalogueText(gWarningCatalog, aId).c_str(), aText.c_str());
}

/// Brings up the settings the parameter store needs (key files) and the catalogues' words.
void initRuntime(const fs::path& theConfig)
{
    setenv("QORVEX_INIT_DIR", theConfig.c_str(), 1);
    fdfInit(false, CQORV_VERSION_TEXT, false);
    gErrorCatalog.read(fdfSettingPath(CQORV_CEOS_DES_FILES_DIR, "qorv_errors_catalog.des").c_str());
    gWarningCatalog.read(fdfSettingPath(CQORV_CEOS_DES_FILES_DIR, "qorv_warnings_catalog.des").c_str());
}

}  // namespace

int main(int argc, char** argv)
{
    CImportOptions o;
    try {
        o = parseOptions(argc, argv);
        if (o.mHelp) {
            std::fputs(CQORV_IMPORT_HELP, stdout);
            return 0;
        }
        initRuntime(qfocus::findConfiguration(o.mConfig, fs::canonical("/proc/self/exe").parent_path()));
    } catch (const std::exception& e) {
        std::fprintf(stderr, "qorvex-import: %s\n", e.what());
        return CQORV_EXIT_USAGE;
    }
    const bool aShowProgress = !o.mQuiet && isatty(STDERR_FILENO);
    int aExitId = 0;
    CJson aJson = CJson::object();
    CJson& aInputs = aJson["inputs"] = CJson::array();
    for (const fs::path& aInput : o.mInputs) {
        CImportRequest q;
        q.mInput = aInput;
        q.mOutDir = o.mOut;
        q.mOrbitFile = o.mOrbit;
        q.mAuxFile = o.mAux;
        q.mFirstRecord = o.mFirst;
        q.mRecordCount = o.mCount;
        if (aShowProgress)
            q.mProgress = [&](const std::string& theStage, int p) {
                std::fprintf(stderr, "\r\033[2Kqorvex-import: %s: %s %d %%", aInput.c_str(), theStage.c_str(), p);
            };
        try {
            const CImportReport r = fqorvImport(q);
            if (aShowProgress) std::fputs("\r\033[2K", stderr);
            printReport(r);
            aInputs.push(inputJson(aInput, &r, 0, ""));
            if (!r.mWarnings.empty() && aExitId == 0) aExitId = CQORV_WARNINGS_PSEUDO_ID;
        } catch (const CImportFailure& e) {
            if (aShowProgress) std::fputs("\r\033[2K", stderr);
            std::fprintf(stderr, "qorvex-import: %s: failure %d: %s: %s\n", aInput.c_str(), e.id(),
                         catalogueText(gErrorCatalog, e.id()).c_str(), e.parameter());
            aInputs.push(inputJson(aInput, nullptr, e.id(), e.parameter()));
            if (aExitId == 0 || aExitId == CQORV_WARNINGS_PSEUDO_ID) aExitId = e.id();
        } catch (const std::exception& e) {
            // Nothing of the import layer throws this; a library under it may (no memory).
            if (aShowProgress) std::fputs("\r\033[2K", stderr);
            std::fprintf(stderr, "qorvex-import: %s: failure %d: %s\n", aInput.c_str(), CQORV_ERR_CATCH_ALL, e.what());
            aInputs.push(inputJson(aInput, nullptr, CQORV_ERR_CATCH_ALL, e.what()));
            if (aExitId == 0 || aExitId == CQORV_WARNINGS_PSEUDO_ID) aExitId = CQORV_ERR_CATCH_ALL;
        }
    }
    aJson["exit_id"] = aExitId;
    if (!o.mJson.empty()) {
        try {
            aJson.dumpFile(o.mJson.string());
        } catch (const std::exception& e) {
            std::fprintf(stderr, "qorvex-import: cannot write %s: %s\n", o.mJson.c_str(), e.what());
            if (aExitId == 0 || aExitId == CQORV_WARNINGS_PSEUDO_ID) aExitId = CQORV_ERR_WRITE_FILE;
        }
    }
    std::fprintf(stderr, "QORVEX EXIT ID: %d\n", aExitId);
    return fqorvExitStatus(aExitId);
}
