#include "qorv_sim_options.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <functional>
#include <map>
#include <stdexcept>

#include "qorv_json.h"

namespace {

[[noreturn]] void bad(const std::string& theWhat) { throw std::runtime_error(theWhat); }

double toDouble(const std::string& theOption, const std::string& theText)
{
    char* aEnd = nullptr;
    errno = 0;
    const double v = std::strtod(theText.c_str(), &aEnd);
    if (theText.empty() || *aEnd != '\0' || errno != 0 || !std::isfinite(v))
        bad(theOption + ": \"" + theText + "\" is not a number");
    return v;
}

long toLong(const std::string& theOption, const std::string& theText, long theMin, long theMax)
{
    char* aEnd = nullptr;
    errno = 0;
    const long v = std::strtol(theText.c_str(), &aEnd, 10);
    if (theText.empty() || *aEnd != '\0' || errno != 0) bad(theOption + ": \"" + theText + "\" is not a whole number");
    if (v < theMin || v > theMax)
        bad(theOption + ": " + theText + " is outside " + std::to_string(theMin) + " .. " + std::to_string(theMax));
    return v;
}

std::vector<std::string> split(const std::string& theText, char theSep)
{
    std::vector<std::string> aParts;
    std::size_t aFrom = 0;
    for (;;) {
        const std::size_t aAt = theText.find(theSep, aFrom);
        aParts.push_back(theText.substr(aFrom, aAt == std::string::npos ? std::string::npos : aAt - aFrom));
        if (aAt == std::string::npos) break;
        aFrom = aAt + 1;
    }
    return aParts;
}

/// "a:b" as two whole numbers.
std::pair<long, long> pairOf(const std::string& theOption, const std::string& theText)
{
    const std::vector<std::string> p = split(theText, ':');
    if (p.size() != 2) bad(theOption + ": expected PULSE:VALUE, got \"" + theText + "\"");
    return {toLong(theOption, p[0], 0, 899999), toLong(theOption, p[1], -65535, 65535)};
}

void readTargets(CSimScene& s, const std::string& theText)
{
    if (theText.rfind("grid:", 0) == 0) {
        const std::vector<std::string> p = split(theText.substr(5), 'x');
        if (p.size() != 2) bad("--targets: expected grid:RxC, got \"" + theText + "\"");
        s.mGrid.mRows = static_cast<int>(toLong("--targets", p[0], 0, 1000));
        s.mGrid.mCols = static_cast<int>(toLong("--targets", p[1], 0, 1000));
        s.mTargets.erase(std::remove_if(s.mTargets.begin(), s.mTargets.end(), [](const CSimTarget& t) { return t.mListed; }),
                         s.mTargets.end());
        return;
    }
    CJson j;
    try {
        j = CJson::parseFile(theText);
    } catch (const std::exception& e) {
        bad("--targets: " + std::string(e.what()));
    }
    CJson aWrapped = CJson::object();
    aWrapped["targets"] = j.isArray() ? j : (j.has("targets") ? j["targets"] : CJson());
    if (!aWrapped["targets"].isArray()) bad("--targets: " + theText + " holds no array of targets");
    fqorvSimApplySceneJson(s, aWrapped);
}

/// "P[:VALUE],...": garbage of one field at pulses P, each with its value or the field's default.
void readGarbage(CSimScene& s, CSimGarbageField theField, const std::string& theOption, const std::string& theText)
{
    if (s.mArchive == CSimArchive::Raw || s.mArchive == CSimArchive::Alos)
        bad(theOption + " writes into native ERS archives only (--format ceos or e2)");
    for (const std::string& aItem : split(theText, ',')) {
        const std::vector<std::string> p = split(aItem, ':');
        if (p.size() > 2) bad(theOption + ": expected PULSE or PULSE:VALUE, got \"" + aItem + "\"");
        CSimGarbage g;
        g.mField = theField;
        g.mPulse = toLong(theOption, p[0], 0, 899999);
        if (p.size() == 2) g.mValue = toLong(theOption, p[1], 0, 4294967295L);
        s.mFaults.mGarbage.push_back(g);
    }
}

/// The options that take a value, and what they do to the scene and the command.
using Handler = std::function<void(CSimScene&, CSimCommand&, const std::string& theOption, const std::string& theValue)>;

Handler garbageOption(CSimGarbageField theField)
{
    return [theField](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { readGarbage(s, theField, o, v); };
}

const std::map<std::string, Handler>& valueOptions()
{
    static const std::map<std::string, Handler> aOptions = {
        {"--out", [](CSimScene&, CSimCommand& c, const std::string&, const std::string& v) { c.mRoot = v; }},
        {"--config", [](CSimScene&, CSimCommand& c, const std::string&, const std::string& v) { c.mConfigDir = v; }},
        {"--lines", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mPulses = toLong(o, v, 2, 900000); }},
        {"--samples", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mSamples = static_cast<int>(toLong(o, v, 2, 900000)); }},
        {"--targets", [](CSimScene& s, CSimCommand&, const std::string&, const std::string& v) { readTargets(s, v); }},
        {"--doppler-centroid", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mDopplerCentroid = toDouble(o, v); }},
        {"--snr", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             s.mSnrDb = toDouble(o, v);
             s.mNoise = true;
         }},
        {"--scatterers", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mScatterers = toLong(o, v, 0, 10000000); }},
        {"--scatterer-rms", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mScattererRms = toDouble(o, v); }},
        {"--velocity-error", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mHeaderVelocityError = toDouble(o, v); }},
        {"--scatterer-margin", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mScattererMargin = toLong(o, v, 0, 1000000); }},
        {"--seed", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mSeed = static_cast<uint64_t>(toLong(o, v, 0, 2147483647)); }},
        {"--drop-lines", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             for (const std::string& p : split(v, ',')) s.mFaults.mDroppedPulses.push_back(toLong(o, p, 0, 899999));
         }},
        {"--repeat-line", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             for (const std::string& p : split(v, ',')) s.mFaults.mRepeatedPulses.push_back(toLong(o, p, 0, 899999));
         }},
        {"--swst-change", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             const auto [p, n] = pairOf(o, v);
             s.mFaults.mSwstChanges.push_back({p, static_cast<int>(n)});
         }},
        {"--prf-change", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             const auto [p, n] = pairOf(o, v);
             s.mFaults.mPrfChanges.push_back({p, static_cast<int>(n)});
         }},
        {"--lat", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mCentreLat = toDouble(o, v); }},
        {"--lon", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mCentreLon = toDouble(o, v); }},
        {"--incidence", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mIncidenceDeg = toDouble(o, v); }},
        {"--epoch", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             if (!fqorvSimParseIsoDate(v, s.mEpoch)) bad(o + ": \"" + v + "\" is not YYYY-MM-DDThh:mm:ss.ffffff");
         }},
        {"--pattern-extent", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mRadar.mPatternExtent = toDouble(o, v); }},
        {"--rms-dn", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mRmsDn = toDouble(o, v); }},
        {"--gain", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mGain = toDouble(o, v); }},
        {"--bits", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             s.mCodeBits = static_cast<int>(toDouble(o, v));
             if (s.mCodeBits < 5 || s.mCodeBits > 8) throw std::runtime_error(o + " wants 5 to 8");
         }},
        {"--counter-start", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mCounter0 = toLong(o, v, 0, 4000000000L); }},
        {"--header-offset", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mHeaderOffset = static_cast<int32_t>(toLong(o, v, 0, 1 << 30)); }},
        {"--threads", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) { s.mThreads = static_cast<int>(toLong(o, v, 1, 64)); }},
        {"--wild-pri", garbageOption(CSimGarbageField::Pri)},
        {"--wild-swst", garbageOption(CSimGarbageField::Swst)},
        {"--wild-counter", garbageOption(CSimGarbageField::Counter)},
        {"--corrupt-clock", garbageOption(CSimGarbageField::Clock)},
        {"--corrupt-marker", garbageOption(CSimGarbageField::Marker)},
        {"--noise-packets", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             if (s.mArchive != CSimArchive::Asar) bad(o + " goes with --format n1");
             s.mFaults.mNoisePackets = toLong(o, v, 0, 100000);
         }},
        {"--cal-packets", [](CSimScene& s, CSimCommand&, const std::string& o, const std::string& v) {
             if (s.mArchive != CSimArchive::Asar) bad(o + " goes with --format n1");
             for (const std::string& p : split(v, ',')) s.mFaults.mCalibrationPulses.push_back(toLong(o, p, 0, 899999));
         }},
    };
    return aOptions;
}

const std::map<std::string, std::function<void(CSimScene&, CSimCommand&)>>& flagOptions()
{
    static const std::map<std::string, std::function<void(CSimScene&, CSimCommand&)>> aFlags = {
        {"--no-noise", [](CSimScene& s, CSimCommand&) { s.mNoise = false; }},
        {"--left", [](CSimScene& s, CSimCommand&) { s.mLookSign = -1; }},
        {"--right", [](CSimScene& s, CSimCommand&) { s.mLookSign = 1; }},
        {"--ascending", [](CSimScene& s, CSimCommand&) { s.mAscending = true; }},
        {"--descending", [](CSimScene& s, CSimCommand&) { s.mAscending = false; }},
        {"--write-doppler", [](CSimScene& s, CSimCommand&) { s.mWriteDoppler = true; }},
        {"--quiet", [](CSimScene&, CSimCommand& c) { c.mQuiet = true; }},
    };
    return aFlags;
}

bool isKnownPreset(const std::string& theName)
{
    const std::vector<std::string> n = fqorvSimPresetNames();
    return std::find(n.begin(), n.end(), theName) != n.end() || theName == "alos-fbs";
}

/// The options read in the first pass, before the layers: they take a value and are skipped later.
bool isLayerOption(const std::string& theOption)
{
    return theOption == "--preset" || theOption == "--scene" || theOption == "--format" || theOption == "--ceos-layout";
}

CSimArchive archiveOf(const std::string& theName)
{
    if (theName == "raw") return CSimArchive::Raw;
    if (theName == "ceos") return CSimArchive::Ceos;
    if (theName == "e2" || theName == "e1" || theName == "envisat") return CSimArchive::Envisat;
    if (theName == "n1") return CSimArchive::Asar;
    if (theName == "alos") return CSimArchive::Alos;
    bad("--format: unknown format \"" + theName + "\" (raw, ceos, e2, n1, alos)");
}

}  // namespace

std::string fqorvSimUsage()
{
    return R"(usage: qorvex_simulate [options]

Simulates a stripmap SAR raw product: ROOT (raw raster), ROOT.sml (header), ROOT_truth.json;
with --format, an ERS CEOS, ENVISAT-format or ALOS archive and ROOT_truth.json.

Scene:
  --preset NAME            ers2 (default), ers1, envisat, alos (FBS), alos-fbd
  --full-frame             the preset's full frame (ERS-2: 28000 lines x 5616 samples, 300 targets)
  --scene FILE             scene file (JSON, key names of the truth file; a truth file re-simulates its scene)
  --lines N                pulses (lines counted in pulses)
  --samples N              complex samples per echo line
  --lat DEG --lon DEG      scene centre (geodetic, WGS-84) used to place the orbit and the window
  --incidence DEG          incidence angle at the scene centre
  --left | --right         looking side (default right)
  --ascending | --descending   pass direction
  --epoch YYYY-MM-DDThh:mm:ss.ffffff   UTC of t = 0
  --doppler-centroid HZ    Doppler at the beam centre (squint); any value, also beyond +-PRF/2
  --pattern-extent X       echoes kept while |L sin(psi)/lambda| <= X (default 2: second null)
Targets and noise:
  --targets grid:RxC       R x C point targets off the image grid (default per preset)
  --targets FILE           JSON array of {id, amplitude, phase_deg, ecef:[x,y,z] | lat, lon, h | line, pixel, h}
  --scatterers N           N random point scatterers over the image, complex Gaussian reflectivity
  --scatterer-rms A        their rms amplitude (default 0.1; targets have amplitude 1)
  --scatterer-margin N     the scatterer field runs N lines beyond each end of the image (default 0),
                           so that the beam sees clutter on both sides at the first and last lines
  --snr DB                 image SNR of a unit target (default 40 dB)
  --no-noise               no thermal noise
  --rms-dn X               rms of each 5-bit component in codes (default 4.5)
  --gain G                 fixed gain, codes per unit amplitude (instead of --rms-dn)
  --bits N                 bits of each byte-sample component, 5 (default) to 8 (ERS, ALOS)
  --seed N                 seed of all random draws (default 1)
Faults (at pulse indices):
  --drop-lines a,b,..      pulses transmitted but not recorded (the line counter jumps)
  --repeat-line n[,m..]    pulses recorded twice with the same counter
  --swst-change P:N        from pulse P on the sampling window moves by N codes (ERS: 4 samples a code,
                           the chain follows multiples of 22; ENVISAT and ALOS: samples); repeatable
  --prf-change P:CODE      from pulse P on the PRI code is CODE; repeatable (ALOS: CODE in 210.94 ns
                           units as for the raw product, the records state the PRF in mHz)
Garbage in native archives (pulse lists, each P or P:VALUE; without a value the field's default):
  --wild-pri LIST          PRI code (default 0)
  --wild-swst LIST         SWST code (default 4095)
  --wild-counter LIST      image format counter (default: half the 24-bit range away)
  --corrupt-clock LIST     on-board time (default: the ticks XOR 0x5A5A5A5A)
  --corrupt-marker LIST    the 0xAA byte of the auxiliary block (default 0)
ASAR packets (--format n1):
  --noise-packets N        noise packets before the first echo (default 8)
  --cal-packets LIST       pulses whose echo packet is a calibration packet (comma separated)
Output:
  --format raw|ceos|e2|n1|alos  raw product (default); ERS CEOS directory ROOT/; ENVISAT-format ROOT.E2
                           (ROOT.E1 for ERS-1), ERS scenes only; n1: ENVISAT ASAR level 0 ROOT.N1 with
                           ROOT_ASA_INS_AX and ROOT_DOR_VOR_AX (preset envisat); alos: ALOS level 1.0
                           directory ROOT/ (LED-<id>, IMG-HH-<id>, FBD also IMG-HV-<id>; presets alos,
                           alos-fbd). The truth file is ROOT_truth.json
  --ceos-layout NAME       facility layout of the CEOS data file: pgs (default), co, eic, ccrs, asf
  --out ROOT               output root (default sim_<preset>)
  --write-doppler          write the true centroid as a one-row Processing.DopCenRangeCoeff
  --velocity-error X       the header's processing velocity is the true one times 1 + X (default 0)
  --counter-start N        line counter of pulse 0
  --header-offset N        bytes before the first record
  --threads N              threads (default: all cores)
  --config DIR             directory of Qorvex_configuration.ini (default $QORVEX_INIT_DIR, else the build's)
  --quiet                  no progress
  --help                   this text
)";
}

void fqorvSimParseCommandLine(const std::vector<std::string>& theArgs, CSimScene& theScene, CSimCommand& theCommand)
{
    // First pass: the layers below the options (preset, full frame, scene file) and --help.
    std::string aPreset, aSceneFile, aFormat = "raw", aLayoutName;
    bool aFull = false;
    for (std::size_t i = 0; i < theArgs.size(); ++i) {
        const std::string& a = theArgs[i];
        if (a == "--help" || a == "-h") {
            theCommand.mHelp = true;
            return;
        }
        if (a == "--full-frame") aFull = true;
        if (isLayerOption(a) && i + 1 >= theArgs.size()) bad(a + " needs a value");
        if (a == "--preset") aPreset = theArgs[++i];
        if (a == "--scene") aSceneFile = theArgs[++i];
        if (a == "--format") aFormat = theArgs[++i];
        if (a == "--ceos-layout") aLayoutName = theArgs[++i];
    }
    CJson aScene;
    if (!aSceneFile.empty()) {
        try {
            aScene = CJson::parseFile(aSceneFile);
        } catch (const std::exception& e) {
            bad("--scene: " + std::string(e.what()));
        }
        if (aPreset.empty() && aScene.isObject()) {
            std::string aNamed;
            if (aScene.has("preset") && aScene["preset"].isString()) aNamed = aScene["preset"].string();
            else if (aScene.has("simulator") && aScene["simulator"].isObject() && aScene["simulator"].has("preset") &&
                     aScene["simulator"]["preset"].isString())
                aNamed = aScene["simulator"]["preset"].string();
            if (isKnownPreset(aNamed)) aPreset = aNamed;
        }
    }
    if (aPreset.empty()) aPreset = "ers2";
    if (!fqorvSimApplyPreset(theScene, aPreset, aFull))
        bad("--preset: unknown preset \"" + aPreset + "\" (ers2, ers1, envisat, alos, alos-fbd)");
    CSimCeosLayout aLayout = CSimCeosLayout::PgsVmp;
    if (!aLayoutName.empty() && !fqorvSimParseCeosLayout(aLayoutName, aLayout))
        bad("--ceos-layout: unknown layout \"" + aLayoutName + "\" (pgs, co, eic, ccrs, asf)");
    const CSimArchive aArchive = archiveOf(aFormat);
    if (!aLayoutName.empty() && aArchive != CSimArchive::Ceos) bad("--ceos-layout goes with --format ceos");
    fqorvSimApplyArchive(theScene, aArchive, aLayout);
    if (!aSceneFile.empty()) fqorvSimApplySceneJson(theScene, aScene);

    // Second pass: the options, in order.
    for (std::size_t i = 0; i < theArgs.size(); ++i) {
        const std::string& a = theArgs[i];
        if (isLayerOption(a)) {
            ++i;
            continue;
        }
        if (a == "--full-frame") continue;
        if (auto f = flagOptions().find(a); f != flagOptions().end()) {
            f->second(theScene, theCommand);
            continue;
        }
        auto v = valueOptions().find(a);
        if (v == valueOptions().end()) bad("unknown option \"" + a + "\" (see --help)");
        if (i + 1 >= theArgs.size()) bad(a + " needs a value");
        v->second(theScene, theCommand, a, theArgs[++i]);
    }
    if (theCommand.mRoot.empty()) theCommand.mRoot = "sim_" + theScene.mPreset;
}
