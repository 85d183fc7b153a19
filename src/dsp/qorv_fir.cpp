#include "qorv_fir.h"

#include <cmath>

#include "qorv_bessel.h"

std::vector<CFirTap> fqorvDesignBandPassFir(int theTaps, double theBandwidthRad, double theRotationRad)
{
    const double aPi = std::acos(-1.0);
    const int aCentre = theTaps / 2;
    std::vector<CFirTap> aTaps(theTaps > 0 ? theTaps : 0);
    for (int k = 0; k < theTaps; ++k) {
        const int m = k - aCentre;
        CFirTap& aTap = aTaps[k];
        if (m == 0) {
            aTap.mWindow = 1.0;
            aTap.mAmplitude = theBandwidthRad / (2.0 * aPi);
            aTap.mValue = dcomplex(aTap.mAmplitude, 0.0);
            continue;
        }
        aTap.mWindow = kaiserWeight(k, theTaps, CQORV_KAISER_BETA_FIR);
        aTap.mAmplitude = std::sin(m * theBandwidthRad / 2.0) * aTap.mWindow / (m * aPi);
        const double aAngle = -m * theRotationRad;
        aTap.mValue = dcomplex(aTap.mAmplitude * std::cos(aAngle), aTap.mAmplitude * std::sin(aAngle));
    }
    return aTaps;
}
