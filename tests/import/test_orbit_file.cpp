// Outside orbit files: a good table with the liberties users take, and the refusals.
#include <string>

#include <gtest/gtest.h>

#include "qorv_date.h"
#include "qorv_import_failure.h"
#include "qorv_orbit_file.h"
#include "qorvex_test_support.h"

namespace {

const std::string kVectors =
    "2000-02-29T23:59:50.5 4123456.789 -812345.678 5678901.234 -1234.5 -7345.6 456.7\n"
    "  2000-02-29T23:59:59.999999\t4123000 -812000 5678000 -1234 -7345 456\r\n"
    "2000-03-01T00:00:10 4122000 -811000 5677000 -1233 -7344 455\n"
    "2000-03-01T00:00:20 4121000 -810000 5676000 -1232 -7343 454\n";

TEST(OrbitFile, ReadsVectorsWithTimesFromTheReferenceDay)
{
    qtest::TempDir aDir;
    qtest::writeFile(aDir / "orbit.txt", "# precise orbit\n\n   # indented comment\n" + kVectors + "  \n");
    const auto v = fqorvReadOrbitFile(aDir / "orbit.txt", fqorvDaysFromCivil(2000, 2, 29));
    ASSERT_EQ(v.size(), 4u);
    EXPECT_DOUBLE_EQ(v[0].mTime, 86390.5);
    EXPECT_NEAR(v[1].mTime, 86399.999999, 1e-9);
    EXPECT_DOUBLE_EQ(v[3].mTime, 86420.0);
    EXPECT_DOUBLE_EQ(v[0].mPosition[2], 5678901.234);
    EXPECT_DOUBLE_EQ(v[3].mVelocity[2], 454.0);
}

TEST(OrbitFile, RefusesABadLineAndTimesGoingBack)
{
    qtest::TempDir aDir;
    auto expectFailure = [&](const std::string& theText, int theId, const std::string& theWords) {
        qtest::writeFile(aDir / "orbit.txt", theText);
        try {
            fqorvReadOrbitFile(aDir / "orbit.txt", 0);
            ADD_FAILURE() << theWords;
        } catch (const CImportFailure& e) {
            EXPECT_EQ(e.id(), theId) << e.parameter();
            EXPECT_NE(std::string(e.parameter()).find(theWords), std::string::npos) << e.parameter();
        }
    };
    expectFailure(kVectors + "2000-03-01T00:00:30 1 2 3 4 5\n", CQORV_ERR_IMPORT_ORBIT_FILE,
                  "line 5 is not a time and six numbers: 2000-03-01T00:00:30 1 2 3 4 5");
    expectFailure(kVectors + "2000-03-01T00:00:20 1 2 3 4 5 6\n", CQORV_ERR_IMPORT_TIME_ORDER,
                  "line 5: its time is not after that of line 4");
}

}  // namespace
