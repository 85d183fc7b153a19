#include "qorv_image_stats.h"

#include <cmath>

#include "qorv_cell_types.h"
#include "qorv_generic_utility.h"

void CGuardedSum::add(double theTerm)
{
    if (mSum > 1.0e14) {
        mSum *= 0.1;
        mDivisor *= 10.0;
    }
    mSum += theTerm / mDivisor;
}

CSampleWindow fqorvCentralSampleWindow(int theLines, int thePixels)
{
    return {theLines / 2 - theLines / 6, theLines / 2 + theLines / 6, thePixels / 2 - thePixels / 6,
            thePixels / 2 + thePixels / 6, 2};
}

bool fqorvIsNullCell(double theRe, double theIm, bool theComplex, double theNull)
{
    const auto aNull = [theNull](double v) { return std::isnan(v) || NQORV_UTILITY::isNullValue(v, theNull); };
    if (!theComplex) return aNull(theRe);
    return (std::isnan(theRe) || std::isnan(theIm)) || (aNull(theRe) && aNull(theIm));
}

void CImageStats::add(double theValue, bool theRootOfValue)
{
    if (theValue < mMin) mMin = theValue;
    if (theValue > mMax) mMax = theValue;
    if (theValue < 0.0) mNegative = true;
    const double a = theRootOfValue ? std::sqrt(std::fabs(theValue)) : std::fabs(theValue);
    mSum.add(a);
    mSumSq.add(a * a);
    ++mCount;
}

bool CImageStats::finish()
{
    if (mCount == 0) return false;
    const double n = static_cast<double>(mCount);
    mMean = mSum.value() / n;
    const double aVar = mSumSq.value() / n - mMean * mMean;
    mStd = aVar > 0.0 ? std::sqrt(aVar) : 0.0;
    if (std::isnan(mMean)) mMean = 254.0;
    return true;
}

double fqorvTiffSaturation(double theSaturation)
{
    return std::fabs(theSaturation) <= NQORV_UTILITY::CQORV_NULL_TOLERANCE ? 1.0 / 3.0 : theSaturation;
}

CStretch fqorvMakeStretch(int theDataUnits, const CImageStats& theStats, double theSaturation, double theScaleIn,
                          double theExponent)
{
    const double aSat = fqorvTiffSaturation(theSaturation);
    const double aScaleIn = theScaleIn < 0.0 ? 1.0 : theScaleIn;
    CStretch s;
    if (theExponent > -0.9) s.mExponent = theExponent;
    switch (theDataUnits) {
    case CQORV_UNITS_COHERENCE:
    case CQORV_UNITS_ENTROPY:
    case CQORV_UNITS_ANISOTROPY:
        s.mScale = 254.0;
        s.mExponent = 1.0;
        return s;
    case CQORV_UNITS_CLASSIFICATION:
    case CQORV_UNITS_EDGE_MAP:
    case CQORV_UNITS_REGION_MERGING_MODULE:
        s.mScale = 1.0;
        s.mExponent = 1.0;
        s.mRounded = true;
        return s;
    default: break;
    }
    const double aMean = std::fabs(theStats.mMean);
    if (theStats.mNegative) {
        s.mSigned = true;
        s.mScale = 254.0 * 0.5 * aSat * aScaleIn / aMean;
        return s;
    }
    s.mScale = 254.0 * aSat * aScaleIn / std::pow(aMean, s.mExponent);
    // The mean of a power unit is an amplitude mean: the mapping takes the root of each window mean.
    if (theDataUnits == CQORV_UNITS_POWER || theDataUnits == CQORV_UNITS_CALIBRATED) s.mExponent *= 0.5;
    return s;
}

uint8_t fqorvStretchByte(const CStretch& theStretch, double theSum, int theCount)
{
    if (theCount <= 0) return 0;
    const double v = theSum / theCount;
    if (theStretch.mRounded) {
        const long t = NQORV_UTILITY::nint(v);
        return static_cast<uint8_t>(t < 0 ? 1 : (t > 254 ? 255 : t + 1));
    }
    if (theStretch.mSigned) {
        double t = std::trunc(v * theStretch.mScale);
        if (t < -127.0) return 1;
        if (t > 127.0) t = 127.0;
        return static_cast<uint8_t>(static_cast<int>(t + 127.0) + 1);
    }
    const double p = std::pow(v, theStretch.mExponent) * theStretch.mScale;
    if (std::isnan(p)) return 1;
    if (p < 0.0) return 1;
    if (p > 254.0) return 255;
    return static_cast<uint8_t>(static_cast<int>(p) + 1);
}
