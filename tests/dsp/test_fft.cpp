// The transform wrapper: unscaled forward and inverse, any alignment, 2-D and column plans.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <numbers>
#include <vector>

#include "qorv_fft.h"

namespace {

TEST(Fft1D, ToneLandsInItsBinAndARoundTripScalesByN)
{
    const int n = 5616;  // a full ERS line: not a power of two
    FftPlan1D aForward(n, FftDirection::Forward), aInverse(n, FftDirection::Inverse);
    std::vector<fcomplex> x(n + 1);
    fcomplex* aData = x.data() + 1;  // deliberately misaligned
    for (int i = 0; i < n; ++i) aData[i] = std::polar(1.0f, static_cast<float>(2.0 * std::numbers::pi * 7 * i / n));
    const std::vector<fcomplex> aOriginal(aData, aData + n);
    aForward.execute(aData);
    EXPECT_NEAR(std::abs(aData[7]), n, 1e-2 * n);
    EXPECT_LT(std::abs(aData[8]), 1e-2 * n);
    aInverse.execute(aData);
    for (int i = 0; i < n; i += 997) EXPECT_NEAR(std::abs(aData[i] / static_cast<float>(n) - aOriginal[i]), 0.0, 1e-4);
}

TEST(Fft2D, TwoDimensionalAndColumnTransformsAgree)
{
    const int r = 64, c = 48;
    FftBuffer a(r * c), b(r * c);
    for (int i = 0; i < r * c; ++i) a[i] = b[i] = fcomplex(std::sin(0.37f * i), std::cos(0.11f * i));
    FftPlan2D aPlan(r, c, FftDirection::Forward);
    aPlan.execute(a.data());
    // 2-D transform = row transforms then column transforms.
    FftPlan1D aRow(c, FftDirection::Forward);
    for (int k = 0; k < r; ++k) aRow.execute(b.data() + k * c);
    FftPlanColumns aColumns(r, c, FftDirection::Forward);
    aColumns.execute(b.data());
    for (int i = 0; i < r * c; i += 37) EXPECT_NEAR(std::abs(a[i] - b[i]), 0.0, 1e-3 * std::abs(a[0]) + 1e-3);
}

TEST(FftThreads, ThreadedPlansGiveBitIdenticalResults)
{
    const int r = 512, c = 256;
    for (const bool aColumns : {false, true}) {
        FftBuffer a(r * c), b(r * c);
        for (int i = 0; i < r * c; ++i) a[i] = b[i] = fcomplex(std::sin(0.37f * i), std::cos(0.011f * i));
        fqorvFftSetThreads(1);
        if (aColumns) FftPlanColumns(r, c, FftDirection::Forward).execute(a.data());
        else FftPlan2D(r, c, FftDirection::Forward).execute(a.data());
        fqorvFftSetThreads(2);
        if (aColumns) FftPlanColumns(r, c, FftDirection::Forward).execute(b.data());
        else FftPlan2D(r, c, FftDirection::Forward).execute(b.data());
        fqorvFftSetThreads(1);
        EXPECT_EQ(std::memcmp(a.data(), b.data(), sizeof(fcomplex) * r * c), 0) << (aColumns ? "columns" : "2-D");
    }
}

}  // namespace
