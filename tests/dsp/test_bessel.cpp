// Bessel I0 against reference values and the Kaiser window's shape.
#include <gtest/gtest.h>

#include "qorv_bessel.h"

namespace {

TEST(BesselI0, MatchesReferenceValuesOnBothSidesOfTheBreak)
{
    // Reference values from the power series sum (x^2/4)^k / (k!)^2.
    const std::pair<double, double> aRef[] = {{0.0, 1.0},         {1.0, 1.266065878},  {2.12, 2.481517983},
                                              {3.7, 8.738617524},  {3.8, 9.516888026},  {4.538, 18.07623479},
                                              {10.0, 2815.716628}};
    for (const auto& [x, v] : aRef) {
        EXPECT_NEAR(besselI0(x) / v, 1.0, 2e-4) << x;
        EXPECT_DOUBLE_EQ(besselI0(-x), besselI0(x));
    }
}

TEST(Kaiser, SymmetricPeakOneAndEdgesOneOverI0Beta)
{
    const auto w = kaiserWindow(11, CQORV_KAISER_BETA_WEIGHT);
    EXPECT_DOUBLE_EQ(w[5], 1.0);
    EXPECT_NEAR(w[0], 1.0 / besselI0(2.12), 1e-12);
    for (int i = 0; i < 11; ++i) EXPECT_DOUBLE_EQ(w[i], w[10 - i]);
    EXPECT_EQ(kaiserWindow(1, 2.12), std::vector<double>{1.0});
}

}  // namespace
