#include "qorv_bessel.h"

#include <cmath>

double besselI0(double x)
{
    const double ax = std::fabs(x);
    if (ax < 3.75) {
        // A&S 9.8.1, t = x / 3.75
        const double y = (x / 3.75) * (x / 3.75);
        return 1.0 + y * (3.5156229 + y * (3.0899424 + y * (1.2067492 + y * (0.2659732 +
                     y * (0.0360768 + y * 0.0045813)))));
    }
    // A&S 9.8.2: x^(1/2) e^(-x) I0(x) as a polynomial of 3.75 / x
    const double y = 3.75 / ax;
    return (std::exp(ax) / std::sqrt(ax)) *
           (0.39894228 + y * (0.01328592 + y * (0.00225319 + y * (-0.00157565 + y * (0.00916281 +
            y * (-0.02057706 + y * (0.02635537 + y * (-0.01647633 + y * 0.00392377))))))));
}

double kaiserWeight(int i, int n, double theBeta)
{
    if (n < 2) return 1.0;
    const double x = 2.0 * (i - (n - 1) / 2.0) / (n - 1);
    const double r = 1.0 - x * x;
    return besselI0(theBeta * std::sqrt(r > 0.0 ? r : 0.0)) / besselI0(theBeta);
}

std::vector<double> kaiserWindow(int n, double theBeta)
{
    std::vector<double> w(n > 0 ? n : 0);
    for (int i = 0; i < n; ++i) w[i] = kaiserWeight(i, n, theBeta);
    return w;
}
