// The band-pass FIR: taps against the windowed sinc, and the pass band measured from the taps.
#include <gtest/gtest.h>

#include <cmath>

#include "qorv_bessel.h"
#include "qorv_fir.h"

namespace {

const double kPi = std::acos(-1.0);

/// |sum_m h_m exp(-j w m)|, m counted from the centre tap.
double response(const std::vector<CFirTap>& theTaps, double w)
{
    const int c = static_cast<int>(theTaps.size()) / 2;
    dcomplex aSum = 0.0;
    for (int k = 0; k < static_cast<int>(theTaps.size()); ++k)
        aSum += theTaps[k].mValue * std::polar(1.0, -w * (k - c));
    return std::abs(aSum);
}

TEST(BandPassFir, TapsAreTheKaiserWindowedSincRotated)
{
    const int L = 33;  // 8 * 4 + 1, the prefilter's length for a decimation of 4
    const double bw = 2.0 * kPi * 0.8 / 4.0, rot = 0.7;
    const auto aTaps = fqorvDesignBandPassFir(L, bw, rot);
    ASSERT_EQ(aTaps.size(), 33u);
    EXPECT_DOUBLE_EQ(aTaps[16].mAmplitude, bw / (2.0 * kPi));
    EXPECT_EQ(aTaps[16].mValue, dcomplex(bw / (2.0 * kPi), 0.0));
    for (int k = 0; k < L; ++k) {
        if (k == 16) continue;
        const int m = k - 16;
        const double x = 2.0 * (k - 16.0) / 32.0;
        const double w = besselI0(4.538 * std::sqrt(1.0 - x * x)) / besselI0(4.538);  // I0 is checked alone
        const double h = std::sin(m * bw / 2.0) * w / (m * kPi);
        EXPECT_NEAR(aTaps[k].mWindow, w, 1e-6) << k;
        EXPECT_NEAR(std::abs(aTaps[k].mValue - std::polar(h, -m * rot)), 0.0, 1e-7) << k;
    }
    EXPECT_EQ(fqorvDesignBandPassFir(1, bw, rot).size(), 1u);
}

TEST(BandPassFir, RotationShiftsThePassBandAndKeepsItsWidth)
{
    const double bw = 2.0 * kPi * 0.8 / 4.0;
    for (double rot : {0.0, 0.9, -2.0}) {
        const auto aTaps = fqorvDesignBandPassFir(33, bw, rot);
        // Pass band centred at -rot: unit gain there, half amplitude at the edges, stop band deep.
        EXPECT_NEAR(response(aTaps, -rot), 1.0, 0.01) << rot;
        EXPECT_NEAR(response(aTaps, -rot + bw / 2.0), 0.5, 0.02) << rot;
        EXPECT_NEAR(response(aTaps, -rot - bw / 2.0), 0.5, 0.02) << rot;
        EXPECT_LT(response(aTaps, -rot + kPi), 1e-3) << rot;
    }
}

}  // namespace
