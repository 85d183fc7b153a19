// The one band-pass FIR design of the system: a Kaiser-windowed sinc, shifted in frequency.
//
// Range compression's azimuth prefilter and the omega-k subaperture filter both use it.
#pragma once

#include <vector>

#include "qorv_complex.h"

/// One tap of the filter: its Kaiser weight, its real low-pass amplitude and its complex value.
struct CFirTap {
    double mWindow;
    double mAmplitude;
    dcomplex mValue;
};

/// Designs theTaps taps (odd; 1 gives the centre tap alone). With m = k - theTaps/2 and the Kaiser
/// weight w of beta 4.538 over the taps, the amplitude is sin(m bw/2) w / (m pi), the centre tap
/// bw / (2 pi) with w = 1; the value is amplitude * exp(-j m theRotationRad). Both angles are in
/// radians per sample: theBandwidthRad the full pass band, theRotationRad the band centre.
std::vector<CFirTap> fqorvDesignBandPassFir(int theTaps, double theBandwidthRad, double theRotationRad);
