#include "qorv_chirp.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>

#include "qorv_bessel.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"

bool gQorvChirpListing = false;

int fqorvChirpPoints(double fs, double tau)
{
    return static_cast<int>(tau * fs) + 1;
}

CChirpReplica fqorvMakeChirp(double f0, double theBandwidth, double fs, double tau, double theDelay, double p0,
                             int theWindowLen, const char* theChirpDirection, const char* theSpectrum,
                             double theAmplitude, fcomplex* theBuffer, int theBufferLen)
{
    const double aTwoPi = 2.0 * std::acos(-1.0);
    const double dt = 1.0 / fs;
    const int M = fqorvChirpPoints(fs, tau);

    // A pulse of no length is one sample of the carrier: rate and start frequency 0.
    double k = tau > 0.0 ? theBandwidth / tau : 0.0;
    if (std::strcmp(theChirpDirection, "UP_CHIRP") != 0) k = -k;
    const double fstart = tau * k * -0.5;

    const int d = static_cast<int>(std::ceil(fs * theDelay));
    const double t0 = d * dt - theDelay;

    fdfTrace("chirp #pts, chirp rate (H/s**2), start freq., tau, fs: %d  %.6e  %.6e  %.6e  %.6e\n", M, k, fstart,
             tau, fs);
    fdfTrace("delay, integer sample delay, fractional sample delay: %.6e  %d  %.6e\n", theDelay, d, t0);
    if (theDelay < 0.0) fdfTrace("warning: chirp starts before begining of data window!\n");
    if (M + d > theWindowLen) fdfTrace("warning: chirp stops after end of data window!\n");

    // NORMAL: phase = 2 pi (k t/2 + fstart + f0) t - p0. Inverted spectrum: the conjugate chirp,
    // 2 pi ((f0 - fstart) t - k t t/2) + p0, which is the NORMAL form with f0 -> -f0, negated.
    const bool aNormal = std::strcmp(theSpectrum, "NORMAL") == 0;
    const double aSign = aNormal ? 1.0 : -1.0;
    const double aQuadratic = aTwoPi * k / 2.0;
    const double aLinear = aTwoPi * (fstart + aSign * f0);
    const int aBufferLen = theBufferLen < 0 ? theWindowLen : theBufferLen;
    const int aLimit = aNormal ? std::min(theWindowLen, aBufferLen) : aBufferLen;

    const int aFirst = std::max(0, -d);
    const int aEnd = std::min(M, aLimit - d);
    for (int i = aFirst; i < aEnd; ++i) {
        const double t = i * dt + t0;
        const double aPhase = aSign * ((aQuadratic * t + aLinear) * t - p0);
        fcomplex& aSample = theBuffer[i + d];
        aSample = fcomplex(aSample.real() + static_cast<float>(theAmplitude * std::cos(aPhase)),
                           aSample.imag() + static_cast<float>(theAmplitude * std::sin(aPhase)));
    }
    return CChirpReplica{M, k};
}

std::vector<double> fqorvWeightChirp(fcomplex* theReplica, int thePoints)
{
    std::vector<double> aWeights = kaiserWindow(thePoints, CQORV_KAISER_BETA_WEIGHT);
    for (int i = 0; i < thePoints; ++i) theReplica[i] *= static_cast<float>(aWeights[i]);
    return aWeights;
}

void fqorvListChirp(const char* theOutputName, const fcomplex* theReplica, const std::vector<double>& theWeights,
                    int thePoints)
{
    if (!gQorvChirpListing) return;
    const std::string aOutput = theOutputName;
    const std::size_t aSlash = aOutput.find_last_of('/');
    const std::string aPath =
        (aSlash == std::string::npos ? std::string() : aOutput.substr(0, aSlash + 1)) + "range_chirp.dat";
    std::FILE* aFile = std::fopen(aPath.c_str(), "w");
    if (!aFile) {
        fdfTrace("cannot open range chirp data file: range_chirp.dat\n");
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aPath.c_str());
    }
    for (int i = 0; i < thePoints; ++i)
        std::fprintf(aFile, "%5d  %10.5lf  %10.5lf  %10.5lf\n", i, theWeights[i],
                     static_cast<double>(theReplica[i].real()), static_cast<double>(theReplica[i].imag()));
    std::fclose(aFile);
}
