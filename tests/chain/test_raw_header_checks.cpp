// The physical checks of a raw header: valid headers of every sensor pass, each impossible value
// is refused with 848647 and words that name the field, and a driver run ends with status 13.
#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <memory>

#include "qorv_date.h"
#include "qorv_description_section.h"
#include "qorv_errors.h"
#include "qorv_raw_header_checks.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;
using qtest::DriverSandbox;

fs::path simulate(const DriverSandbox& theBox, const std::string& thePreset, std::vector<std::string> theOptions = {})
{
    const fs::path aRaw = theBox.data() / (thePreset + "_raw");
    for (const char* a : {"--lines", "512", "--samples", "1024", "--targets", "grid:1x1", "--preset"}) theOptions.push_back(a);
    theOptions.push_back(thePreset);
    const qtest::RunResult aRun = theBox.simulate(aRaw, theOptions);
    EXPECT_EQ(aRun.mStatus, 0) << aRun.mStderr;
    return aRaw;
}

std::unique_ptr<CDescriptionHeader> readHeader(const fs::path& theRaw)
{
    auto aHeader = CDescriptionHeader::makeFull();
    EXPECT_TRUE(aHeader->read((theRaw.string() + "_hdr").c_str(), true));
    return aHeader;
}

/// Sets element theIndex of a vector field, or the value of a scalar one.
void set(CDescriptionHeader& h, const char* theKey, double theValue, int theIndex = 0)
{
    CDescriptionField& f = h[theKey];
    if (f.mStructure == CQORV_DS_VECTOR) f.setValue(theIndex, theValue);
    else f.setValue(theValue);
}

double get(const CDescriptionHeader& h, const char* theKey, int theIndex = 0)
{
    const CDescriptionField& f = h[theKey];
    return f.mStructure == CQORV_DS_VECTOR ? f.getDouble(theIndex) : f.getDouble();
}

/// The date text of the start time plus theSeconds.
std::string startPlus(const CDescriptionHeader& h, double theSeconds)
{
    CQorvDate aDate;
    EXPECT_TRUE(aDate.parse(h["AcquisitionParameters.AzimuthStartTime"].getString()));
    aDate.set(aDate.dayNumber(), aDate.secondsOfDay() + theSeconds);
    return aDate.text();
}

TEST(RawHeaderChecks, HeadersOfEverySensorPassAndTheValuesTheChainGivesAMeaningAreKept)
{
    DriverSandbox aBox;
    for (const char* aPreset : {"ers2", "ers1", "envisat", "alos", "alos-fbd"}) {
        SCOPED_TRACE(aPreset);
        const fs::path aRaw = simulate(aBox, aPreset, {"--write-doppler", "--doppler-centroid", "900"});
        qtest::InProcessEnvironment aEnv;
        EXPECT_NO_THROW(fdfCheckRawHeader(*readHeader(aRaw)));
    }
    // A velocity of 0 is left to the estimation; no state vectors with the scene centre given.
    qtest::InProcessEnvironment aEnv;
    auto h = readHeader(aBox.data() / "ers2_raw");
    set(*h, "Processing.ProcessingVelocity", 0.0);
    (*h)["StateVectorData.nStateVectors"].setValue(0);
    (*h)["Processing.DopCenRangeCoeff"].reset();
    EXPECT_NO_THROW(fdfCheckRawHeader(*h));
}

TEST(RawHeaderChecks, EachImpossibleValueIsRefusedWithWordsNamingTheFieldAndItsRange)
{
    DriverSandbox aBox;
    const fs::path aRaw = simulate(aBox, "ers2");
    struct CCase {
        std::function<void(CDescriptionHeader&)> mBreak;
        const char* mWords;
    };
    using H = CDescriptionHeader;
    const CCase aCases[] = {
        {[](H& h) { set(h, "ChannelInfo.CarrierFrequency", -5.3e9); },
         "ChannelInfo.CarrierFrequency = -5.3e+09 Hz: the carrier of a spaceborne SAR lies in 2e+08 .. 4e+10 Hz"},
        {[](H& h) { set(h, "ChannelInfo.CarrierFrequency", 1e3); }, "ChannelInfo.CarrierFrequency = 1000 Hz"},
        {[](H& h) { set(h, "ChannelInfo.PRF", NAN); }, "ChannelInfo.PRF = NaN Hz: the pulse repetition frequency"},
        {[](H& h) { set(h, "ChannelInfo.PRFExtracted", INFINITY); }, "ChannelInfo.PRFExtracted = inf Hz"},
        {[](H& h) { set(h, "ChannelInfo.BandWidth", 2.0 * get(h, "ChannelInfo.SamplingRate")); },
         "the chirp's bandwidth lies above 0 and at most the sampling rate"},
        {[](H& h) { set(h, "ChannelInfo.PulseDuration", 1e-4); },
         "ChannelInfo.PulseDuration = 0.0001 s: the pulse lies above 0 and below the echo window"},
        {[](H& h) { set(h, "ChannelInfo.IncidenceAngle", 120.0); }, "ChannelInfo.IncidenceAngle = 120 deg"},
        {[](H& h) { set(h, "Processing.FastTime", 1.5 * get(h, "Processing.FastTime")); },
         "Processing.FastTime[0] = "},
        {[](H& h) { set(h, "Processing.PixelSpacingRg", 1e3 * get(h, "Processing.PixelSpacingRg")); },
         "Processing.PixelSpacingRg = "},
        {[](H& h) { set(h, "Processing.ProcessingVelocity", -7100.0); },
         "Processing.ProcessingVelocity = -7100 m/s: the effective velocity of an orbiting platform"},
        {[](H& h) { set(h, "StateVectorData.TimeDelta", -15.0); }, "StateVectorData.TimeDelta = -15 s"},
        {[](H& h) { set(h, "StateVectorData.TimeDelta", 0.5 * get(h, "StateVectorData.TimeDelta")); },
         "StateVectorData.TimeDelta: state vectors 0 and 1 lie"},
        {[](H& h) { set(h, "StateVectorData.pos_z", 1e-3 * get(h, "StateVectorData.pos_z", 2), 2); },
         "StateVectorData.pos_x/y/z[2] = "},
        {[](H& h) { h["StateVectorData.nStateVectors"].setValue(3); }, "StateVectorData.nStateVectors = 3"},
        {[](H& h) { h["StateVectorData.TimeFirst"].setValue(startPlus(h, -3600.0)); },
         "StateVectorData.TimeFirst = "},
        {[](H& h) { h["AcquisitionParameters.AzimuthStopTime"].setValue(startPlus(h, 600.0)); },
         "AcquisitionParameters.AzimuthStopTime = "},
        {[](H& h) { h["AcquisitionParameters.AzimuthStartTime"].setValue("yesterday"); },
         "AcquisitionParameters.AzimuthStartTime = \"yesterday\""},
        {[](H& h) {
             h["Processing.DopCenRangeCoeff"].resize(1, 1);
             h["Processing.DopCenRangeCoeff"].setValue(0, 0, 1e6);
         },
         "Processing.DopCenRangeCoeff: a Doppler centroid of 1e+06 Hz at mid swath"},
        {[](H& h) { h["Sensor.SensorName"].setValue("FOOSAT"); },
         "Sensor.SensorName = \"FOOSAT\": not a known sensor; the known names are RADARSAT-1, "},
        {[](H& h) { h["Sensor.SensorName"].setValue("ERS2"); }, "did you mean \"ERS-2\"?"},
        {[](H& h) { h["Sensor.SensorName"].setValue("alos-palsar"); }, "did you mean \"ALOS_PALSAR\"?"},
    };
    qtest::InProcessEnvironment aEnv;
    for (const CCase& c : aCases) {
        SCOPED_TRACE(c.mWords);
        auto h = readHeader(aRaw);
        c.mBreak(*h);
        EXPECT_QORV_FAILURE(fdfCheckRawHeader(*h), CQORV_ERR_IMPOSSIBLE_VALUE);
        EXPECT_NE(aEnv.trace().find(c.mWords), std::string::npos) << aEnv.trace().substr(aEnv.trace().rfind("Impossible"));
        aEnv.reinit();
    }
}

TEST(RawHeaderChecks, ADriverRunOnAnImpossibleHeaderEndsWithStatus13BeforeAnyStep)
{
    DriverSandbox aBox;
    const fs::path aRaw = simulate(aBox, "ers2");
    {
        qtest::InProcessEnvironment aEnv;
        auto h = readHeader(aRaw);
        set(*h, "ChannelInfo.CarrierFrequency", -5.3e9);
        ASSERT_TRUE(h->write((aRaw.string() + "_hdr").c_str(), true, false));
    }
    const qtest::RunResult aRun = aBox.run(aBox.writeArguments(DriverSandbox::defaultArguments(aRaw, aBox.data() / "x_slc")));
    EXPECT_EQ(aRun.mStatus, 13) << aRun.mStderr;
    EXPECT_EQ(aRun.mExitId, CQORV_ERR_IMPOSSIBLE_VALUE);
    const std::string aWorking = qtest::readFile(aBox.workingFile().string() + "_error");
    EXPECT_NE(aWorking.find("[EC : 848647]"), std::string::npos) << aWorking;
    EXPECT_NE(aWorking.find("ChannelInfo.CarrierFrequency = -5.3e+09 Hz"), std::string::npos) << aWorking;
    // Nothing read the header before: no parameter file, no copy of the original header.
    EXPECT_FALSE(fs::exists(aBox.data() / "x_par.sml"));
    EXPECT_FALSE(fs::exists(aRaw.string() + "_old.sml"));
}

}  // namespace
