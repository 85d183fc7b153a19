// Bessel I0 and the Kaiser windows built on it.
#pragma once

#include <vector>

/// Kaiser beta of the FIR prefilter taps.
inline constexpr double CQORV_KAISER_BETA_FIR = 4.538;
/// Kaiser beta of the azimuth and chirp weighting.
inline constexpr double CQORV_KAISER_BETA_WEIGHT = 2.12;

/// Modified Bessel function of order zero: the polynomial approximations of Abramowitz and
/// Stegun 9.8.1 (|x| below 3.75) and 9.8.2 (above). Relative error under 2e-7 for |x| up to 40,
/// under 5e-7 for any argument (9.8.2 bounds the error of x^(1/2) e^(-x) I0(x), which tends to 0.399).
double besselI0(double x);

/// Kaiser weight of sample i of n: I0(beta sqrt(1 - x^2)) / I0(beta), x = 2 (i - (n-1)/2) / (n-1).
double kaiserWeight(int i, int n, double theBeta);

/// The n Kaiser weights. For n of 1 the single weight is 1.
std::vector<double> kaiserWindow(int n, double theBeta);
