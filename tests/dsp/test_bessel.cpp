// Bessel I0 against its power series in long double, and the Kaiser window's shape.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "qorv_bessel.h"

namespace {

/// I0 by its power series sum (x/2)^(2k) / (k!)^2 in long double.
long double seriesI0(long double x)
{
    long double aSum = 1.0L, aTerm = 1.0L;
    for (int k = 1; k < 5000 && aTerm > aSum * 1e-22L; ++k) {
        aTerm *= (x / 2) * (x / 2) / (static_cast<long double>(k) * k);
        aSum += aTerm;
    }
    return aSum;
}

double relativeError(double x)
{
    return static_cast<double>(std::fabs(besselI0(x) / seriesI0(x) - 1.0L));
}

TEST(BesselI0, HoldsItsAccuracyOnBothSidesOfTheBreakAndForNegativeArguments)
{
    double aWorst = 0.0;
    for (int i = 0; i <= 20000; ++i) {
        const double x = i * 0.001;
        aWorst = std::max({aWorst, relativeError(x), relativeError(-x)});
    }
    EXPECT_LT(aWorst, 2e-7);
    for (double x = 20.0; x <= 40.0; x += 0.01) ASSERT_LT(relativeError(x), 2e-7) << x;
    for (double x = 40.0; x <= 700.0; x += 0.1) ASSERT_LT(relativeError(x), 5e-7) << x;
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
