// Polynomial fits: recovery where double precision fails, the solver's refusals with their
// warnings, the evaluation forms, and the double-precision fit of the Doppler estimator.
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "qorv_polynomial_utility.h"
#include "qorv_small_matrix.h"
#include "qorvex_test_support.h"

namespace {

// p(x) = sum a_k (x - x0)^k on integer abscissae x0 .. x0 + 30: every value is an exact double,
// so the least-squares polynomial of order 5 is p itself.
const double kX0 = 1.0e5;
const double kA[6] = {7.0, -3.0, 2.0, 5.0, -1.0, 0.5};

double shiftedPolynomial(double x)
{
    const double u = x - kX0;
    double v = 0.0;
    for (int k = 5; k >= 0; --k) v = v * u + kA[k];
    return v;
}

/// Monomial coefficients of p, c_k = sum_j a_j C(j, k) (-x0)^(j - k), in long double.
std::vector<long double> monomialCoefficients()
{
    std::vector<long double> c(6, 0.0L);
    for (int j = 0; j <= 5; ++j) {
        long double aBinomial = 1.0L;
        for (int k = 0; k <= j; ++k) {
            if (k > 0) aBinomial = aBinomial * (j - k + 1) / k;
            c[k] += kA[j] * aBinomial * std::pow(-static_cast<long double>(kX0), j - k);
        }
    }
    return c;
}

TEST(PolynomialFit, RecoversOrderFiveAtLargeAbscissaeWhereDoublePrecisionFails)
{
    std::vector<double> x, y;
    for (int i = 0; i <= 31; ++i) {  // 32 samples: the fit uses the first 31
        x.push_back(kX0 + i);
        y.push_back(shiftedPolynomial(kX0 + i));
    }
    PolynomialFit aFit;
    ASSERT_TRUE(aFit.Fit(5, static_cast<int>(x.size()), x.data(), y.data(), -9999.0));
    const auto c = aFit.Coefficients();
    const auto aExact = monomialCoefficients();
    ASSERT_EQ(c.size(), 6u);
    for (int k = 0; k < 6; ++k) EXPECT_NEAR(c[k] / static_cast<double>(aExact[k]), 1.0, 1e-15) << k;
    for (double aX : {kX0, kX0 + 12.5, kX0 + 30.0, kX0 + 31.0})
        EXPECT_NEAR(aFit.Evaluate(aX), shiftedPolynomial(aX), 1e-9 * std::fabs(shiftedPolynomial(aX))) << aX;

    // The same normal equations in double precision lose the polynomial entirely.
    double aWorst = 0.0;
    try {
        const auto d = fqorvPolyFit(x.data(), y.data(), 5, 31);
        for (int i = 0; i <= 30; ++i) {
            double v = 0.0;
            for (int k = 5; k >= 0; --k) v = v * x[i] + d[k];
            aWorst = std::max(aWorst, std::fabs(v - y[i]) / std::fabs(y[i]));
        }
    } catch (const DSPMathException&) {
        aWorst = INFINITY;
    }
    EXPECT_GT(aWorst, 1e-3);
}

TEST(PolynomialFit, RefusalsGiveTheirResultsAndWarnings)
{
    qtest::InProcessEnvironment aEnv;
    std::vector<double> x, y;
    for (int i = 0; i < 60; ++i) {
        x.push_back(0.1 * i);
        y.push_back(1.0 + 0.5 * x.back());
    }
    const std::vector<double> aSame(5, 3.0), aAny{1.0, 2.0, 3.0, 4.0, 5.0};

    EXPECT_EQ(fqorvPolySolve(49, 5, aAny.data(), aAny.data()), CQORV_POLY_ORDER_RANGE);
    EXPECT_EQ(fqorvPolySolve(0, 5, aAny.data(), aAny.data()), CQORV_POLY_ORDER_RANGE);
    EXPECT_EQ(fqorvPolySolve(2, 1, aAny.data(), aAny.data()), CQORV_POLY_FEW_SAMPLES);
    EXPECT_EQ(fqorvPolySolve(2, 5, aSame.data(), aAny.data()), CQORV_POLY_SINGULAR);
    EXPECT_EQ(fqorvPolySolve(0, 0, nullptr, nullptr), CQORV_POLY_DONE);

    PolynomialFit aFit;
    EXPECT_TRUE(aFit.Fit(48, 60, x.data(), y.data(), 0.0));
    EXPECT_NEAR(aFit.Evaluate(2.05), 2.025, 1e-6);

    EXPECT_FALSE(aFit.Fit(2, 5, aSame.data(), aAny.data(), 0.0));
    EXPECT_EQ(aFit.CoefficientCount(), 0);
    EXPECT_FALSE(aFit.Fit(49, 60, x.data(), y.data(), 0.0));
    EXPECT_FALSE(aFit.Fit(0, 60, x.data(), y.data(), 0.0));
    EXPECT_FALSE(aFit.Fit(1, 2, x.data(), y.data(), 0.0));  // one sample reaches the solver
    const std::string aTrace = aEnv.trace();
    EXPECT_NE(aTrace.find("Coef matrix is singular"), std::string::npos);
    EXPECT_NE(aTrace.find(" Order out of range (1-48)"), std::string::npos);
    EXPECT_NE(aTrace.find(" # data samples < 2 "), std::string::npos);
}

TEST(PolynomialFit, EvaluationByTableSampleListPolynomialAndFastForm)
{
    PolynomialFit aPoly;
    aPoly.SetCoefficients({2.5, -1.0, 0.25});
    EXPECT_EQ(aPoly.Evaluate(0.0), 2.5);
    EXPECT_DOUBLE_EQ(aPoly.Evaluate(4.0), 2.5 - 4.0 + 4.0);
    // The imprecise form is the sum of the coefficients wherever it is asked.
    EXPECT_DOUBLE_EQ(aPoly.FastEvaluate(0.0), 1.75);
    EXPECT_DOUBLE_EQ(aPoly.FastEvaluate(100.0), 1.75);

    PolynomialFit aList;
    aList.SetOutsideValue(-9999.0);
    aList.SetSampleList({{0.0, 10.0}, {1.0, 20.0}, {3.0, 0.0}});
    EXPECT_DOUBLE_EQ(aList.Evaluate(0.25), 12.5);
    EXPECT_DOUBLE_EQ(aList.Evaluate(2.5), 5.0);
    EXPECT_DOUBLE_EQ(aList.Evaluate(1.0), 20.0);
    EXPECT_EQ(aList.Evaluate(3.5), -9999.0);

    PolynomialFit aTable;
    aTable.SetOutsideValue(-1.0);
    aTable.SetTable(100.0, 10.0, 1.0, {1.0, 3.0, 7.0});
    EXPECT_DOUBLE_EQ(aTable.Evaluate(115.0), 5.0);
    EXPECT_DOUBLE_EQ(aTable.Evaluate(120.0), 7.0);
    EXPECT_EQ(aTable.Evaluate(130.0), -1.0);
}

TEST(PolyFitDouble, RecoversLineAndQuadraticAndRefusesSingularSystems)
{
    std::vector<double> aRow, aLine, aRange, aQuad;
    for (int i = 0; i < 40; ++i) {
        aRow.push_back(250.0 * i);                 // row numbers
        aLine.push_back(310.0 - 0.004 * aRow.back());  // Doppler in Hz along the image
        aRange.push_back(8.5e5 + 500.0 * i);       // slant ranges in metres
        const double u = aRange.back();
        aQuad.push_back(1.0e-9 * u * u - 2.0e-3 * u + 900.0);
    }
    const auto aL = fqorvPolyFit(aRow.data(), aLine.data(), 1, 40);
    ASSERT_EQ(aL.size(), 2u);
    EXPECT_NEAR(aL[0], 310.0, 1e-9);
    EXPECT_NEAR(aL[1], -0.004, 1e-14);
    const auto aQ = fqorvPolyFit(aRange.data(), aQuad.data(), 2, 40);
    ASSERT_EQ(aQ.size(), 3u);
    for (int i = 0; i < 40; i += 13)
        EXPECT_NEAR(aQ[0] + aRange[i] * (aQ[1] + aRange[i] * aQ[2]), aQuad[i], 1e-4) << i;  // Hz; double normal equations at 850 km keep ~1e-7

    const std::vector<double> aSame(6, 4.0), aAny{1, 2, 3, 4, 5, 6};
    EXPECT_THROW(fqorvPolyFit(aSame.data(), aAny.data(), 1, 6), DSPMathException);
    try {
        fqorvPolyFit(aSame.data(), aAny.data(), 2, 6);
        ADD_FAILURE() << "no exception";
    } catch (const DSPMathException& e) {
        EXPECT_STREQ(e.what(), "Invert of singular matrix");
    }
}

}  // namespace
