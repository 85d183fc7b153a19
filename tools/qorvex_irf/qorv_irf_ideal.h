// Ideal impulse responses of the focuser's weighting, built as spectra and measured with the same
// upsampling and cut routines as the image's targets.
#pragma once

#include <functional>
#include <vector>

#include "qorv_fft.h"
#include "qorv_irf_measure.h"

/// Number of bins of an ideal spectrum: long enough that the band's edges fall within 1/4096 of
/// the sampling rate and that the periodic response is the continuous one within the cut.
inline constexpr int CQORV_IRF_IDEAL_BINS = 4096;

/// Measures a response given by its spectrum (n bins in transform order, band centred on
/// theCentre bins): upsampled by theUpsample opposite the centre, cut through the peak.
CIrfCut fqorvIrfMeasureSpectrum(const std::vector<fcomplex>& theSpectrum, double theCentre, int theUpsample,
                                double theSidelobeWidths = CQORV_IRF_SIDELOBE_WIDTHS);

/// Spectrum of n bins over theRate (Hz) holding a Kaiser (beta) weighted band of theWidth (Hz)
/// centred on theCentre (Hz), times theShape(f - theCentre) when one is given.
std::vector<fcomplex> fqorvIrfKaiserBand(int n, double theRate, double theWidth, double theCentre, double theBeta,
                                         const std::function<double(double)>& theShape = {});

/// Ideal range response: a Kaiser 2.12 weighted band of theBandwidth (Hz) sampled at
/// theSamplingRate (Hz). Widths in range samples.
CIrfCut fqorvIrfIdealRangeBand(double theBandwidth, double theSamplingRate, int theUpsample,
                               double theSidelobeWidths = CQORV_IRF_SIDELOBE_WIDTHS);

/// Ideal range response of the chain's matched filter: the linear chirp of theBandwidth (Hz) and
/// thePulseLength (s) sampled at theSamplingRate (Hz), compressed against its replica weighted by
/// Kaiser 2.12 over the replica's samples. Widths in range samples.
CIrfCut fqorvIrfIdealRangeChirp(double theBandwidth, double thePulseLength, double theSamplingRate, int theUpsample,
                                double theSidelobeWidths = CQORV_IRF_SIDELOBE_WIDTHS);

/// Ideal azimuth response: Kaiser 2.12 over theFraction x thePrf (Hz) centred on the Doppler
/// centroid theCentroid (Hz), times the two-way antenna pattern sinc^2(L sin(psi) / lambda) with
/// sin(psi) = lambda (f - fdc) / (2 V), L theAntennaLength (m), V theVelocity (m/s). A length of 0
/// leaves the pattern out. Widths in lines.
CIrfCut fqorvIrfIdealAzimuth(double thePrf, double theFraction, double theCentroid, double theAntennaLength,
                             double theVelocity, int theUpsample,
                             double theSidelobeWidths = CQORV_IRF_SIDELOBE_WIDTHS);
