// The transmitted pulse's replica: a linear FM chirp made from header values, its Kaiser
// weighting, and the optional listing "range_chirp.dat".
#pragma once

#include <vector>

#include "qorv_complex.h"

/// What the generator reports: the number of replica points M and the chirp rate in Hz/s^2.
struct CChirpReplica {
    int mPoints;
    double mRate;
};

/// Switch of the "range_chirp.dat" listing; off unless a caller sets it.
extern bool gQorvChirpListing;

/// Number of replica points for a sampling rate fs (Hz) and a pulse length tau (s):
/// truncate(tau fs) + 1.
int fqorvChirpPoints(double fs, double tau);

/// Adds the replica A exp(j phase) of a chirp of bandwidth theBandwidth (Hz) and length tau (s),
/// sampled at fs (Hz), into theBuffer from sample ceil(fs theDelay) on (theDelay in s, p0 in rad,
/// f0 a frequency offset in Hz). Rate B/tau, negative unless theChirpDirection is "UP_CHIRP".
/// theSpectrum "NORMAL" keeps samples inside [0, theWindowLen); any other text gives the conjugate
/// replica and keeps samples inside [0, theBufferLen). theBufferLen below 0 means theWindowLen.
CChirpReplica fqorvMakeChirp(double f0, double theBandwidth, double fs, double tau, double theDelay, double p0,
                             int theWindowLen, const char* theChirpDirection, const char* theSpectrum,
                             double theAmplitude, fcomplex* theBuffer, int theBufferLen = -1);

/// Kaiser 2.12 weighting of the first thePoints samples (in place, single precision); returns the
/// weights. One point has weight 1.
std::vector<double> fqorvWeightChirp(fcomplex* theReplica, int thePoints);

/// Writes the listing "range_chirp.dat" in the directory of theOutputName when gQorvChirpListing is
/// on: one line per point (index, weight, real, imaginary). Failure 261123 when it can't be opened.
void fqorvListChirp(const char* theOutputName, const fcomplex* theReplica, const std::vector<double>& theWeights,
                    int thePoints);
