// The header mutation campaign: a valid simulated ERS-2 raw product, one physical field of its
// header broken at a time (not-a-number, plus and minus infinity, zero, its negative, a thousand
// times larger and a thousand times smaller), each broken product through the driver (step 0, range
// compression, Doppler ambiguity, omega-k focusing). A run must end either with a failure id in the result files or with an SLC whose point
// target keeps to its ideal response. The third outcome (an image made from an impossible value,
// a crash, a hang) is what the campaign is here to catch. The table of outcomes is printed and
// written to header_mutations.md in the build directory, from where docs/header-checks.md takes it.
#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "qorv_date.h"
#include "qorv_json.h"
#include "qorvex_irf_check.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

#if defined(__SANITIZE_ADDRESS__)
// Under the sanitizers two mutations of each field reach every refusal path without taking minutes.
constexpr bool kSubset = true;
constexpr int kRunSeconds = 600;
#else
constexpr bool kSubset = false;
constexpr int kRunSeconds = 60;
#endif

// ------------------------------------------------------------------------------------------------
// The mutations

struct CMutation {
    const char* mName;
    double (*mApply)(double);
};

const CMutation kMutations[] = {
    {"NaN", [](double) { return std::nan(""); }},   {"+inf", [](double) { return HUGE_VAL; }},
    {"-inf", [](double) { return -HUGE_VAL; }},     {"0", [](double) { return 0.0; }},
    {"negative", [](double v) { return -v; }},      {"x1000", [](double v) { return 1000.0 * v; }},
    {"/1000", [](double v) { return v / 1000.0; }},
};

/// A number's text broken; an integer keeps integer text where the mutation has one (a thousandth
/// truncated toward zero) and takes the text "NaN" or "inf" where it has none.
std::string fMutateNumber(const std::string& theText, const CMutation& theMutation, bool theInteger)
{
    const double v = theMutation.mApply(std::strtod(theText.c_str(), nullptr));
    if (std::isnan(v)) return "NaN";
    if (std::isinf(v)) return v > 0 ? "inf" : "-inf";
    if (theInteger) return std::to_string(static_cast<long long>(v));
    char aText[64];
    std::snprintf(aText, sizeof aText, "%.17g", v);
    return aText;
}

/// A date broken in its own terms: not a date for NaN, a thousand years later or earlier for the
/// infinities; the other four act on the scene's duration, moving this end of the scene so that
/// the duration becomes 0, its negative, a thousand times longer or shorter.
std::string fMutateDate(const std::string& theStart, const std::string& theStop, bool theStartMoves, const CMutation& theMutation)
{
    const std::string& aOwn = theStartMoves ? theStart : theStop;
    const double aYears = theMutation.mApply(1.0);
    if (std::isnan(aYears)) return "NaN";
    if (std::isinf(aYears)) {
        char aYear[8];
        std::snprintf(aYear, sizeof aYear, "%04d", std::atoi(aOwn.c_str() + 7) + (aYears > 0 ? 1000 : -1000));
        return aOwn.substr(0, 7) + aYear + aOwn.substr(11);
    }
    CQorvDate aStart, aStop;
    EXPECT_TRUE(aStart.parse(theStart.c_str()) && aStop.parse(theStop.c_str()));
    const double aDuration = 86400.0 * static_cast<double>(aStop.dayNumber() - aStart.dayNumber()) + aStop.secondsOfDay() - aStart.secondsOfDay();
    const double aMoved = theMutation.mApply(aDuration);
    CQorvDate& aDate = theStartMoves ? aStart : aStop;
    aDate.set(theStartMoves ? aStop.dayNumber() : aStart.dayNumber(),
              theStartMoves ? aStop.secondsOfDay() - aMoved : aStart.secondsOfDay() + aMoved);
    return aDate.text();
}

// ------------------------------------------------------------------------------------------------
// Editing a header's text

/// The text between <theTag> and </theTag>, as [begin, end) offsets into theHeader.
std::pair<std::size_t, std::size_t> fFieldSpan(const std::string& theHeader, const std::string& theTag)
{
    const std::size_t aOpen = theHeader.find("<" + theTag + ">");
    const std::size_t aClose = theHeader.find("</" + theTag + ">");
    EXPECT_NE(aOpen, std::string::npos) << theTag;
    EXPECT_NE(aClose, std::string::npos) << theTag;
    if (aOpen == std::string::npos || aClose == std::string::npos) return {0, 0};
    return {aOpen + theTag.size() + 2, aClose};
}

std::string fFieldText(const std::string& theHeader, const std::string& theTag)
{
    const auto [aBegin, aEnd] = fFieldSpan(theHeader, theTag);
    return theHeader.substr(aBegin, aEnd - aBegin);
}

/// theHeader with the values of field theTag replaced by theEdit of each: every value of a vector
/// or matrix, or only the value theElement. Returns the first value written in theWritten.
std::string fEditField(const std::string& theHeader, const std::string& theTag, int theElement,
                       const std::function<std::string(const std::string&)>& theEdit, std::string& theWritten)
{
    std::string aHeader = theHeader;
    auto [aBegin, aEnd] = fFieldSpan(aHeader, theTag);
    theWritten.clear();
    if (fFieldText(aHeader, theTag).find("<Value") == std::string::npos) {
        theWritten = theEdit(fFieldText(aHeader, theTag));
        return aHeader.replace(aBegin, aEnd - aBegin, theWritten);
    }
    int aIndex = 0;
    for (std::size_t at = aHeader.find("<Value", aBegin); at < aEnd; at = aHeader.find("<Value", at + 1), ++aIndex) {
        const std::size_t aFrom = aHeader.find('>', at) + 1;
        const std::size_t aTo = aHeader.find('<', aFrom);
        if (theElement >= 0 && aIndex != theElement) continue;
        const std::string aNew = theEdit(aHeader.substr(aFrom, aTo - aFrom));
        if (theWritten.empty()) theWritten = aNew;
        aHeader.replace(aFrom, aTo - aFrom, aNew);
        aEnd = fFieldSpan(aHeader, theTag).second;
    }
    return aHeader;
}

// ------------------------------------------------------------------------------------------------
// The fields and the rows of the campaign

enum class EKind { Number, Integer, StartDate, StopDate, Name };

struct CField {
    const char* mName;  // section.field as the table names it
    EKind mKind = EKind::Number;
    int mElement = -1;  // -1: every value of a vector or matrix
    bool mOnlyImpossible = false;   // a value the chain estimates: only the mutations that no scene can have
};

const std::vector<CField> kFields = {
    {"ChannelInfo.CarrierFrequency"},
    {"ChannelInfo.SamplingRate"},
    {"ChannelInfo.BandWidth"},
    {"ChannelInfo.PulseDuration"},
    {"ChannelInfo.PRF"},
    {"ChannelInfo.PRFExtracted"},
    {"ChannelInfo.IncidenceAngle"},
    {"Processing.SlantRange"},
    {"Processing.FastTime"},
    {"Processing.PixelSpacingRg"},
    {"Processing.PixelSpacingAz"},
    {"Processing.ProcessingVelocity"},
    // The Doppler table is the chain's own estimate (step 1, skipped here): a header may state a
    // wrong one that some scene has (0, -290 Hz, 0.29 Hz), which focuses where that centroid puts
    // the target and no check of the header can tell; the campaign breaks it only beyond what any
    // scene has.
    {"Processing.DopCenRangeCoeff", EKind::Number, -1, true},
    {"InitialGeometry.ReferenceHeight"},
    {"RegistrationCoordinates.LatNorthing"},
    {"RegistrationCoordinates.LonEasting"},
    {"StateVectorData.nStateVectors", EKind::Integer},
    {"StateVectorData.TimeDelta"},
    {"StateVectorData.pos_x"},
    {"StateVectorData.pos_y"},
    {"StateVectorData.pos_z"},
    {"StateVectorData.vel_x"},
    {"StateVectorData.vel_y"},
    {"StateVectorData.vel_z"},
    {"StateVectorData.pos_x", EKind::Number, 7},  // the last vector
    {"StateVectorData.vel_z", EKind::Number, 4},  // the middle one, which the focusing geometry takes
    {"AcquisitionParameters.AzimuthStartTime", EKind::StartDate},
    {"AcquisitionParameters.AzimuthStopTime", EKind::StopDate},
    {"Sensor.SensorName", EKind::Name},
};

// A near miss of a known name and a name of no known sensor.
const std::vector<std::pair<std::string, std::string>> kSensorNames = {{"near miss", "ERS2"}, {"unknown", "FOOSAT"}};

struct CRow {
    std::string mField, mMutation, mWritten, mHeader;
};

std::string fTag(const CField& theField)
{
    const std::string aName = theField.mName;
    return aName.substr(aName.find('.') + 1);
}

std::vector<CRow> fRows(const std::string& theHeader)
{
    const std::string aStart = fFieldText(theHeader, "AzimuthStartTime"), aStop = fFieldText(theHeader, "AzimuthStopTime");
    std::vector<CRow> aRows;
    for (const CField& f : kFields) {
        std::string aLabel = f.mName;
        if (f.mElement >= 0) aLabel += "[" + std::to_string(f.mElement) + "]";
        if (f.mKind == EKind::Name) {
            for (const auto& [aMutation, aName] : kSensorNames) {
                CRow r{aLabel, aMutation, aName, {}};
                r.mHeader = fEditField(theHeader, fTag(f), -1, [&](const std::string&) { return aName; }, r.mWritten);
                aRows.push_back(r);
            }
            continue;
        }
        for (const CMutation& m : kMutations) {
            if (kSubset && std::string(m.mName) != "NaN" && std::string(m.mName) != "negative") continue;
            const std::string aName = m.mName;
            if (f.mOnlyImpossible && aName != "NaN" && aName != "+inf" && aName != "-inf" && aName != "x1000") continue;
            CRow r{aLabel, m.mName, {}, {}};
            std::function<std::string(const std::string&)> aEdit = [&](const std::string& v) {
                return fMutateNumber(v, m, f.mKind == EKind::Integer);
            };
            if (f.mKind == EKind::StartDate || f.mKind == EKind::StopDate)
                aEdit = [&](const std::string&) { return fMutateDate(aStart, aStop, f.mKind == EKind::StartDate, m); };
            r.mHeader = fEditField(theHeader, fTag(f), f.mElement, aEdit, r.mWritten);
            aRows.push_back(r);
        }
    }
    return aRows;
}

// ------------------------------------------------------------------------------------------------
// One run and its outcome

struct COutcome {
    std::string mText;
    std::string mCell;  // the outcome in a word: the failure id, "focused", or what went wrong
    bool mThird = false;
};

/// The parameter of a failure's result file: the lines after its "[EC : id]" line, which cut the
/// words at a fixed width, joined again.
std::string fFailureWords(const std::string& theErrorFile)
{
    std::string aWords;
    bool aAfterId = false;
    for (const std::string& aLine : qtest::readLines(theErrorFile)) {
        if (aAfterId && aLine.find_first_not_of(' ') == std::string::npos) break;
        if (aAfterId) aWords += aLine;
        if (aLine.find("[EC : ") != std::string::npos) aAfterId = true;
    }
    return aWords;
}

/// What the point-target report says of a target out of bounds: its offset and the measures
/// against the ideal (widths as ratios, sidelobe ratios as differences in dB).
std::string fOutOfBounds(const fs::path& theReport)
{
    if (!fs::exists(theReport)) return "no point-target report";
    const CJson aReport = CJson::parseFile(theReport.string());
    if (aReport["targets"].size() != 1 || !aReport["targets"][std::size_t{0}]["found"].boolean()) return "the target is not found";
    const CJson& t = aReport["targets"][std::size_t{0}];
    const CJson& aIdeal = aReport["ideal"];
    char aText[256];
    std::snprintf(aText, sizeof aText, "%.2f lines, %.2f pixels off; widths x%.2f rg, x%.2f az; PSLR %+.1f rg, %+.1f az dB",
                  t["line_error"].number(), t["pixel_error"].number(),
                  t["range"]["irw"].number() / aIdeal["range"]["irw"].number(),
                  t["azimuth"]["irw"].number() / aIdeal["azimuth"]["irw"].number(),
                  t["range"]["pslr_db"].number() - aIdeal["range"]["pslr_db"].number(),
                  t["azimuth"]["pslr_db"].number() - aIdeal["azimuth"]["pslr_db"].number());
    return aText;
}

class CCampaign {
public:
    CCampaign()
    {
        const qtest::RunResult r = mBox.simulate(mBox.data() / "scene_raw", {"--preset", "ers2", "--lines", "1536", "--samples", "1024",
                                                                              "--targets", "grid:1x1", "--no-noise", "--write-doppler"});
        EXPECT_EQ(r.mStatus, 0) << r.mStderr;
        mHeader = qtest::readFile(mBox.data() / "scene_raw.sml");
    }
    const std::string& header() const { return mHeader; }

    /// Runs the driver on the raw raster with theHeader in a directory of its own, removed after.
    COutcome run(const std::string& theHeader, int theIndex)
    {
        const fs::path aDir = mBox.data() / ("run" + std::to_string(theIndex));
        fs::create_directories(aDir);
        fs::create_symlink(mBox.data() / "scene_raw", aDir / "scene_raw");
        qtest::writeFile(aDir / "scene_raw.sml", theHeader);
        auto aArgs = qtest::DriverSandbox::defaultArguments(aDir / "scene_raw", aDir / "scene_slc");
        aArgs[10] = "OK";              // Doppler ambiguity
        aArgs[15] = aArgs[17] = "OK";  // no Doppler estimation and no autofocus: a lone target and no clutter
        const fs::path aWorking = aDir / "Process.working";
        const qtest::RunResult r = mBox.run(mBox.writeArguments(aArgs, "run.txt"),
                                            {{"QORVEX_WORKING_FILE", aWorking.string()}}, kRunSeconds);
        COutcome aOutcome = classify(r, aDir, aWorking);
        if (!std::getenv("QORVEX_KEEP_TEST_DIRS")) fs::remove_all(aDir);
        return aOutcome;
    }

private:
    COutcome classify(const qtest::RunResult& theRun, const fs::path& theDir, const fs::path& theWorking) const
    {
        if (theRun.mStatus == 128 + 9) return {"no end within " + std::to_string(kRunSeconds) + " s", "hang", true};
        if (theRun.mStatus > 128) return {"killed by signal " + std::to_string(theRun.mStatus - 128), "crash", true};
        // 65280: the run ended with warnings (status 1), its products made.
        const bool aFocused = theRun.mExitId == 0 || theRun.mExitId == 65280;
        if (theRun.mExitId < 0 || (aFocused ? theRun.mStatus > 1 : theRun.mStatus == 0)) {
            const std::size_t aLast = theRun.mStderr.find_last_not_of('\n');
            const std::size_t aLine = aLast == std::string::npos ? 0 : theRun.mStderr.rfind('\n', aLast) + 1;
            return {"exit status " + std::to_string(theRun.mStatus) + " with exit id " + std::to_string(theRun.mExitId) + ": " +
                        theRun.mStderr.substr(aLine, 200),
                    "exit", true};
        }
        if (!aFocused) {
            const std::string aError = theWorking.string() + "_error";
            const std::string aId = std::to_string(theRun.mExitId);
            if (!fs::exists(aError) || qtest::readFile(aError).find("[EC : " + aId + "]") == std::string::npos)
                return {aId + ", not in the result files", "no id", true};
            return {aId + " " + fFailureWords(aError), aId, false};
        }
        const fs::path aSlc = theDir / "scene_slc";
        if (!fs::exists(aSlc)) return {"exit 0 without an SLC", "no SLC", true};
        ::testing::TestPartResultArray aFailures;
        {
            ::testing::ScopedFakeTestPartResultReporter aReporter(
                ::testing::ScopedFakeTestPartResultReporter::INTERCEPT_ONLY_CURRENT_THREAD, &aFailures);
            qtest::expectIdealTargets(mBox, aSlc, mBox.data() / "scene_raw_truth.json", 1);
        }
        if (aFailures.size() == 0) return {"focused within bounds", "focused", false};
        return {"exit 0, out of bounds: " + fOutOfBounds(aSlc.string() + "_irf.json"), "bad SLC", true};
    }

    qtest::DriverSandbox mBox;
    std::string mHeader;
};

std::string fMarked(const COutcome& theOutcome, const std::string& theText)
{
    return theOutcome.mThird ? "**" + theText + "**" : theText;
}

/// Two tables in Markdown: the outcome of each field (rows) under each mutation (columns) in a
/// word, then every run with the value written and the words of its outcome.
std::string fTables(const std::vector<CRow>& theRows, const std::vector<COutcome>& theOutcomes)
{
    std::vector<std::string> aFields, aMutations;
    for (const CRow& r : theRows) {
        if (std::find(aFields.begin(), aFields.end(), r.mField) == aFields.end()) aFields.push_back(r.mField);
        if (std::find(aMutations.begin(), aMutations.end(), r.mMutation) == aMutations.end()) aMutations.push_back(r.mMutation);
    }
    std::string aMatrix = "| Field |", aRule = "|---|";
    for (const std::string& m : aMutations) {
        aMatrix += " " + m + " |";
        aRule += "---|";
    }
    aMatrix += "\n" + aRule + "\n";
    for (const std::string& f : aFields) {
        aMatrix += "| " + f + " |";
        for (const std::string& m : aMutations) {
            std::string aCell;
            for (std::size_t k = 0; k < theRows.size(); ++k)
                if (theRows[k].mField == f && theRows[k].mMutation == m) aCell = fMarked(theOutcomes[k], theOutcomes[k].mCell);
            aMatrix += " " + aCell + " |";
        }
        aMatrix += "\n";
    }
    std::string aRuns = "| Field | Mutation | Value written | Outcome |\n|---|---|---|---|\n";
    for (std::size_t k = 0; k < theRows.size(); ++k)
        aRuns += "| " + theRows[k].mField + " | " + theRows[k].mMutation + " | " + theRows[k].mWritten + " | " +
                 fMarked(theOutcomes[k], theOutcomes[k].mText) + " |\n";
    return aMatrix + "\n" + aRuns;
}

// ------------------------------------------------------------------------------------------------

TEST(HeaderMutations, EveryBrokenFieldIsRefusedOrFocusesWithinBounds)
{
    CCampaign aCampaign;
    const auto aBegin = std::chrono::steady_clock::now();
    const COutcome aIntact = aCampaign.run(aCampaign.header(), 0);
    ASSERT_EQ(aIntact.mText, "focused within bounds") << "the intact product";

    // A mutation that writes a header already run (a thousand times 0) is not run again.
    std::map<std::string, COutcome> aRuns = {{aCampaign.header(), aIntact}};
    const std::vector<CRow> aRows = fRows(aCampaign.header());
    std::vector<COutcome> aOutcomes;
    int aThird = 0;
    for (std::size_t k = 0; k < aRows.size(); ++k) {
        const CRow& r = aRows[k];
        if (aRuns.count(r.mHeader) == 0) aRuns[r.mHeader] = aCampaign.run(r.mHeader, static_cast<int>(k) + 1);
        aOutcomes.push_back(aRuns[r.mHeader]);
        EXPECT_FALSE(aOutcomes.back().mThird) << r.mField << " " << r.mMutation << " (" << r.mWritten << "): " << aOutcomes.back().mText;
        aThird += aOutcomes.back().mThird ? 1 : 0;
    }
    const double aSeconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - aBegin).count();
    const std::string aTables = fTables(aRows, aOutcomes);
    const fs::path aOut = qtest::binaryDir().parent_path() / "header_mutations.md";
    qtest::writeFile(aOut, aTables);
    std::printf("%s\n%zu mutations in %zu runs besides the intact product's, %d third outcomes, %.1f s; the tables are in %s\n",
                aTables.c_str(), aRows.size(), aRuns.size() - 1, aThird, aSeconds, aOut.c_str());
}

}  // namespace
