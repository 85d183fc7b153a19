// The in-memory store: field access and its failures, lookup rules, copies, user keys, printing.
#include <cmath>

#include <gtest/gtest.h>

#include "qorv_description_section.h"
#include "qorv_errors.h"
#include "store_test_util.h"

using storetest::StoreEnv;

// A size alone initialises a field and zeroes its numbers; only elements given a value count as
// set; a reset empties the field again.
TEST(StoreFields, ScalarVectorMatrixAccessAndFlags)
{
    StoreEnv aEnv;
    auto aHeader = storetest::makeTestHeader();
    CDescriptionHeader& h = *aHeader;
    CDescriptionField& aInt = h["StoreTest.IntScalar"];
    EXPECT_FALSE(aInt.isInitialised());
    aInt.setValue(7);
    EXPECT_EQ(aInt.getInteger(0), 7);

    CDescriptionField& aVec = h["StoreTest.DblVector"];
    aVec.resize(1, 3);
    EXPECT_TRUE(aVec.isInitialised());
    EXPECT_EQ(aVec.getDouble(2), 0.0);  // no "not set" failure for numbers
    aVec.setValue(2, 4.5);
    EXPECT_EQ(aVec.getDouble(2), 4.5);
    EXPECT_TRUE(aVec.isSet(0, 2));
    EXPECT_FALSE(aVec.isSet(0, 1));
    EXPECT_FALSE(aVec.isSet(0, 9));

    CDescriptionField& aMat = h["StoreTest.StrMatrix"];
    aMat.resize(2, 3);
    aMat.setValue(1, 2, std::string("x"));
    EXPECT_STREQ(aMat.getString(1, 2), "x");

    aVec.reset();
    aInt.reset();
    EXPECT_FALSE(aVec.isInitialised());
    EXPECT_FALSE(aInt.isInitialised());
}

TEST(StoreFields, AccessFailuresCarryTheirIds)
{
    StoreEnv aEnv;
    auto aHeader = storetest::makeTestHeader();
    CDescriptionHeader& h = *aHeader;
    h["StoreTest.IntScalar"].setValue(1);
    h["StoreTest.DblVector"].resize(1, 2);
    h["StoreTest.StrVector"].resize(1, 2);
    h["StoreTest.DblMatrix"].resize(2, 2);

    // Wrong data type, on reads and on writes: no conversion. The trace shows the field first.
    EXPECT_QORV_FAILURE(h["StoreTest.IntScalar"].getDouble(), CQORV_ERR_FIELD_TYPE);
    EXPECT_NE(aEnv.env().trace().find("[IntScalar]  [SCALAR]  [Integer]  =  1\n"), std::string::npos);
    // (A failure closes the run; the ids below come through the same road without trace.)
    EXPECT_QORV_FAILURE(h["StoreTest.DblVector"].setValue(0, 1), CQORV_ERR_FIELD_TYPE);
    EXPECT_QORV_FAILURE(h["StoreTest.IntScalar"].setValue("1"), CQORV_ERR_FIELD_TYPE);
    // The n form beyond element 0 on a SCALAR or a MATRIX is a structure failure.
    EXPECT_QORV_FAILURE(h["StoreTest.IntScalar"].getInteger(1), CQORV_ERR_FIELD_TYPE);
    EXPECT_QORV_FAILURE(h["StoreTest.DblMatrix"].getDouble(1), CQORV_ERR_FIELD_TYPE);
    // Out of range, and writes without storage.
    EXPECT_QORV_FAILURE(h["StoreTest.DblVector"].getDouble(2), CQORV_ERR_INDEX_RANGE);
    EXPECT_QORV_FAILURE(h["StoreTest.DblMatrix"].getDouble(2, 0), CQORV_ERR_INDEX_RANGE);
    EXPECT_QORV_FAILURE(h["StoreTest.DblMatrix"].setValue(0, 2, 1.0), CQORV_ERR_INDEX_RANGE);
    EXPECT_QORV_FAILURE(h["StoreTest.IntVector"].setValue(0, 1), CQORV_ERR_INDEX_RANGE);
    // Not set: a scalar, and any string element.
    EXPECT_QORV_FAILURE(h["StoreTest.DblScalar"].getDouble(), CQORV_ERR_FIELD_NOT_SET);
    EXPECT_QORV_FAILURE(h["StoreTest.StrVector"].getString(1), CQORV_ERR_FIELD_NOT_SET);
    // A MULTIPLE of scalars can't be resized.
    EXPECT_QORV_FAILURE(h["StoreTest.Pair"].resize(1, 2), CQORV_ERR_FIELD_TYPE);
}

TEST(StoreFields, PulseDurationReadPastTheEndAnswersNoValue)
{
    qtest::InProcessEnvironment aEnv;
    auto aHeader = CDescriptionHeader::makeFull();
    CDescriptionField& aPulse = (*aHeader)["ChannelInfo.PulseDuration"];
    aPulse.resize(1, 2);
    EXPECT_EQ(aPulse.getDouble(3), -9999.0);
    EXPECT_NE(aEnv.trace().find("3 READ error"), std::string::npos);
    // The same read on another double vector is a failure.
    (*aHeader)["ChannelInfo.BandWidth"].resize(1, 2);
    EXPECT_QORV_FAILURE((*aHeader)["ChannelInfo.BandWidth"].getDouble(3), CQORV_ERR_INDEX_RANGE);
}

// A MULTIPLE resizes all its sub-fields at once and counts as set when every sub-field is.
TEST(StoreFields, MultipleFieldsResizeAndInitialiseThroughSubFields)
{
    StoreEnv aEnv;
    auto aHeader = storetest::makeTestHeader();
    CDescriptionHeader& h = *aHeader;
    CDescriptionField& aTrack = h["StoreTest.Track"];
    aTrack.resize(1, 5);
    EXPECT_EQ(aTrack.getNbrOfElements(), 5);
    EXPECT_EQ(h["StoreTest.TrackV"].getNbrOfElements(), 5);
    EXPECT_EQ(h["StoreTest.TrackT"].getNbrOfElements(), 5);
    EXPECT_TRUE(aTrack.isInitialised());

    CDescriptionField& aPair = h["StoreTest.Pair"];
    h["StoreTest.PairA"].setValue(1.0);
    EXPECT_FALSE(aPair.isInitialised());
    h["PairB"].setValue(2.0);
    EXPECT_TRUE(aPair.isInitialised());
}

TEST(StoreLookup, QualifiedAndUnqualifiedKeys)
{
    qtest::InProcessEnvironment aEnv;
    auto aHeader = CDescriptionHeader::makeFull();
    CDescriptionHeader& h = *aHeader;
    EXPECT_EQ(&h["ProcessingVelocity"], &h["Processing.ProcessingVelocity"]);
    EXPECT_EQ(&h["Velocity"], &h["sar_processing.Velocity"]);
    EXPECT_EQ(h.findField("Processing.Velocity"), nullptr);  // only that section is searched
    EXPECT_EQ(h.findField("processing.ProcessingVelocity"), nullptr);  // exact case
    EXPECT_EQ(h.findField("NoSuchField"), nullptr);
    EXPECT_QORV_FAILURE(h["NoSection.PRF"], CQORV_ERR_UNKNOWN_KEY);
    EXPECT_QORV_FAILURE(h["NoSuchField"], CQORV_ERR_UNKNOWN_KEY);

    // A null name ends the section list.
    CDescriptionHeader aTwo({"Sensor", "sar_processing", nullptr, "Processing"});
    EXPECT_EQ(aTwo.mSectionNbr, 2);
    EXPECT_EQ(aTwo.getSection("Processing"), nullptr);
}

TEST(StoreCopy, CopiesSetValuesButNeverTheScaleFactors)
{
    qtest::InProcessEnvironment aEnv;
    auto aSource = CDescriptionHeader::makeFull();
    (*aSource)["RasterInfo.RealScaleFactor"].setValue(2.0);
    (*aSource)["RasterInfo.NrOfLinesPerImage"].setValue(28000);
    (*aSource)["ChannelInfo.Description"].resize(1, 2);
    (*aSource)["ChannelInfo.Description"].setValue(1, "VV");

    CDescriptionHeader aTarget({"RasterInfo", "ChannelInfo", "Sensor"});
    aTarget["RasterInfo.NrOfPixelsPerLine"].setValue(5616);
    aTarget["Sensor.SensorName"].setValue("ERS-2");
    aTarget.copyFrom(*aSource, false);
    EXPECT_EQ(aTarget["NrOfLinesPerImage"].getInteger(), 28000);
    EXPECT_EQ(aTarget["NrOfPixelsPerLine"].getInteger(), 5616);  // kept: not set in the source
    EXPECT_TRUE(aTarget["RealScaleFactor"].isEmpty());
    EXPECT_FALSE(aTarget["Description"].isSet(0, 0));
    EXPECT_STREQ(aTarget["Description"].getString(1), "VV");
    aTarget.copyFrom(*aSource, true);
    EXPECT_TRUE(aTarget["NrOfPixelsPerLine"].isEmpty());
    EXPECT_TRUE(aTarget["SensorName"].isEmpty());
}

TEST(StoreUserKeys, SetReplaceAppendAndPrefixLookup)
{
    qtest::InProcessEnvironment aEnv;
    auto aHeader = CDescriptionHeader::makeFull();
    CDescriptionHeader& h = *aHeader;
    std::string aValue;
    EXPECT_FALSE(fqorvGetUserKey(h, "ORIGIN DATA", aValue));
    fqorvSetUserKey(h, "ORIGIN DATA", "ers_raw");
    fqorvSetUserKey(h, "DOPPLER VALUE(0   0)", "310.000000");
    fqorvSetUserKey(h, "DOPPLER VALUE AFTER AMBIGUITY CORRECTION (0   0)", "-1369.900000");
    fqorvSetUserKey(h, "ORIGIN DATA", "ALOS_PALSAR_FBS10");  // replaces the row
    EXPECT_EQ(h["RasterInfo.OtherInfo"].getNbrOfRows(), 3);
    ASSERT_TRUE(fqorvGetUserKey(h, "ORIGIN DATA", aValue));
    EXPECT_EQ(aValue, "ALOS_PALSAR_FBS10");
    ASSERT_TRUE(fqorvGetUserKey(h, "DOPPLER VALUE(0   0)", aValue));
    EXPECT_EQ(aValue, "310.000000");
    ASSERT_TRUE(fqorvGetUserKey(h, "DOPPLER VALUE AFTER", aValue));  // compared over the key's length
    EXPECT_EQ(aValue, "-1369.900000");
    EXPECT_FALSE(fqorvGetUserKey(h, "DOPPLER VALUE(0 0)", aValue));
    // A header without RasterInfo has no user keys.
    CDescriptionHeader aPar({"sar_processing"});
    EXPECT_FALSE(fqorvGetUserKey(aPar, "ORIGIN DATA", aValue));
    EXPECT_QORV_FAILURE(fqorvSetUserKey(aPar, "ORIGIN DATA", "x"), CQORV_ERR_UNKNOWN_KEY);
}

