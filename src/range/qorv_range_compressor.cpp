#include "qorv_range_compressor.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "qorv_chirp.h"
#include "qorv_fir.h"

namespace {

constexpr float CQORV_SMALLEST_NORMAL = 1.1754944e-38f;

bool fSame(float a, float b) { return (std::isnan(a) && std::isnan(b)) || std::fabs(a - b) <= CQORV_SMALLEST_NORMAL; }

}  // namespace

CRangeCompressor::CRangeCompressor(const CRangeChirpParam& theParam)
    : mSize(theParam.mFftSize),
      mSpectrum(static_cast<std::size_t>(std::max(theParam.mFftSize, theParam.mLineLength))),
      mForward(theParam.mFftSize, FftDirection::Forward),
      mInverse(theParam.mFftSize, FftDirection::Inverse)
{
    mSpectrum.clear();
    const CChirpReplica aReplica =
        fqorvMakeChirp(0.0, theParam.mBandwidth, theParam.mSamplingRate, theParam.mPulseDuration, 0.0, 0.0,
                       theParam.mLineLength, theParam.mChirp, theParam.mSpectrum, 1.0, mSpectrum.data(),
                       static_cast<int>(mSpectrum.size()));
    mReplicaPoints = aReplica.mPoints;
    mWeights = fqorvWeightChirp(mSpectrum.data(), mReplicaPoints);
    // Whatever the generator put beyond N takes no part in the transform.
    for (std::size_t i = static_cast<std::size_t>(mSize); i < mSpectrum.size(); ++i) mSpectrum[i] = fcomplex(0.0f, 0.0f);
    mForward.execute(mSpectrum.data());
    for (int i = 0; i < mSize; ++i) mSpectrum[i] = std::conj(mSpectrum[i]);

    if (!theParam.mBaseband) {
        const double a = (std::strcmp(theParam.mSpectrum, "NORMAL") == 0 ? 1.0 : -1.0) * 2.0 * M_PI *
                         theParam.mCarrier / theParam.mSamplingRate;
        const fcomplex aStep(static_cast<float>(std::cos(a)), static_cast<float>(std::sin(a)));
        mMixer.resize(static_cast<std::size_t>(mSize));
        fcomplex aValue(1.0f, 0.0f);
        for (fcomplex& m : mMixer) {
            m = aValue;
            aValue *= aStep;
        }
    }
}

void CRangeCompressor::compress(fcomplex* theWork) const
{
    if (!mMixer.empty())
        for (int i = 0; i < mSize; ++i) theWork[i] *= mMixer[static_cast<std::size_t>(i)];
    mForward.execute(theWork);
    const fcomplex* s = mSpectrum.data();
    for (int i = 0; i < mSize; ++i) theWork[i] *= s[i];
    mInverse.execute(theWork);
}

void fqorvShiftLine(fcomplex* theLine, int theLength, int theShift)
{
    if (theShift == 0 || theLength <= 0) return;
    const int n = std::min(std::abs(theShift), theLength);
    const std::size_t aKept = static_cast<std::size_t>(theLength - n);
    if (theShift > 0) {
        std::memmove(theLine + n, theLine, aKept * sizeof(fcomplex));
        std::fill(theLine, theLine + n, fcomplex(0.0f, 0.0f));
    } else {
        std::memmove(theLine, theLine + n, aKept * sizeof(fcomplex));
        std::fill(theLine + aKept, theLine + theLength, fcomplex(0.0f, 0.0f));
    }
}

bool CIqOffsetEstimate::add(const fcomplex* theSamples, int theWidth)
{
    bool aNull = true;
    for (int k = 1; k < theWidth && aNull; ++k)
        aNull = fSame(theSamples[k].real(), theSamples[0].real()) && fSame(theSamples[k].imag(), theSamples[0].imag());
    if (aNull) return false;
    for (int k = 0; k < theWidth; ++k) {
        const double i = theSamples[k].real(), q = theSamples[k].imag();
        mSumI += i;
        mSumQ += q;
        mSumI2 += i * i;
        mSumQ2 += q * q;
    }
    mCount += theWidth;
    return true;
}

CIqOffsets CIqOffsetEstimate::result() const
{
    CIqOffsets r;
    if (mCount == 0) return r;
    const double n = static_cast<double>(mCount);
    r.mI = mSumI / n;
    r.mQ = mSumQ / n;
    const double aVarQ = mSumQ2 / n - r.mQ * r.mQ;
    const double aVarI = mSumI2 / n - r.mI * r.mI;
    r.mImbalance = aVarQ > 0.0 ? std::sqrt(std::max(aVarI, 0.0)) / std::sqrt(aVarQ) : 1.0;
    return r;
}

bool fqorvIsConstantLine(const fcomplex* theSamples, int theWidth)
{
    for (int k = 1; k < theWidth; ++k)
        if (theSamples[k] != theSamples[0]) return false;
    return true;
}

void fqorvRemoveIqOffsets(fcomplex* theSamples, int theWidth, const CIqOffsets& theOffsets)
{
    const float aI = static_cast<float>(theOffsets.mI);
    const float aQ = static_cast<float>(theOffsets.mQ * theOffsets.mImbalance);
    for (int k = 0; k < theWidth; ++k) theSamples[k] -= fcomplex(aI, aQ);
}

std::vector<fcomplex> fqorvPrefilterTaps(int thePresumming, double theBandFraction, double theCentroidRad,
                                         std::FILE* theListing)
{
    const int aTaps = thePresumming == 1 ? 1 : 8 * thePresumming + 1;
    const double aBandwidth = theBandFraction * 2.0 * M_PI / thePresumming;
    const std::vector<CFirTap> aDesign = fqorvDesignBandPassFir(aTaps, aBandwidth, theCentroidRad);
    std::vector<fcomplex> aValues;
    aValues.reserve(aDesign.size());
    for (std::size_t k = 0; k < aDesign.size(); ++k) {
        const CFirTap& t = aDesign[k];
        aValues.emplace_back(static_cast<float>(t.mValue.real()), static_cast<float>(t.mValue.imag()));
        if (theListing)
            std::fprintf(theListing, "%5d  %10.5lf  %10.5lf  %10.5lf  %10.5lf\n", static_cast<int>(k), t.mWindow,
                         t.mAmplitude, t.mValue.real(), -t.mValue.imag());
    }
    return aValues;
}
