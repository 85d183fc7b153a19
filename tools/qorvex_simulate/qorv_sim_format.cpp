#include "qorv_sim_format.h"

#include <algorithm>
#include <cmath>

#include "qorv_sim_random.h"

namespace {

// Lloyd-Max quantiser of 16 levels for a unit Gaussian: the positive output levels and the
// positive decision thresholds between them (the scheme is symmetric about 0).
constexpr double CQORV_SIM_BAQ_LEVELS[8] = {0.1284, 0.3881, 0.6568, 0.9424, 1.2562, 1.6180, 2.0690, 2.7326};
constexpr double CQORV_SIM_BAQ_THRESHOLDS[7] = {0.2582, 0.5224, 0.7996, 1.0993, 1.4371, 1.8435, 2.4008};

inline uint8_t codeOf(double theValue, double theGain, double theMid, double theTop, long& theClipped)
{
    const double q = std::floor(theValue * theGain) + theMid;
    if (q < 0.0) {
        ++theClipped;
        return 0;
    }
    if (q > theTop) {
        ++theClipped;
        return static_cast<uint8_t>(theTop);
    }
    return static_cast<uint8_t>(q);
}

inline float baq4(double theValue, double theRms, double theInverseRms, long& theSaturated)
{
    const double a = std::fabs(theValue) * theInverseRms;
    int i = 0;
    for (double aThreshold : CQORV_SIM_BAQ_THRESHOLDS) i += a >= aThreshold;  // levels below: no branch
    theSaturated += i == 7;
    const double v = CQORV_SIM_BAQ_LEVELS[i] * theRms;
    return static_cast<float>(theValue < 0.0 ? -v : v);
}

}  // namespace

long fqorvSimQuantiseBytes(const std::complex<double>* theIn, int n, double theGain, int theBits, uint8_t* theOut)
{
    long aClipped = 0;
    const double aMid = static_cast<double>(1 << (theBits - 1)), aTop = static_cast<double>((1 << theBits) - 1);
    for (int i = 0; i < n; ++i) {
        theOut[2 * i] = codeOf(theIn[i].real(), theGain, aMid, aTop, aClipped);
        theOut[2 * i + 1] = codeOf(theIn[i].imag(), theGain, aMid, aTop, aClipped);
    }
    return aClipped;
}

long fqorvSimQuantiseBaq4Bit(const std::complex<double>* theIn, int n, float* theOut)
{
    long aSaturated = 0;
    for (int b = 0; b < n; b += CQORV_SIM_BAQ_BLOCK) {
        const int e = std::min(n, b + CQORV_SIM_BAQ_BLOCK);
        double aPower = 0.0;
        for (int i = b; i < e; ++i) aPower += std::norm(theIn[i]);
        // rms of one component: the block's mean power shared by I and Q.
        const double aRms = std::sqrt(aPower / (2.0 * (e - b)));
        for (int i = b; i < e; ++i) {
            if (aRms <= 0.0) {
                theOut[2 * i] = theOut[2 * i + 1] = 0.0f;
                continue;
            }
            theOut[2 * i] = baq4(theIn[i].real(), aRms, 1.0 / aRms, aSaturated);
            theOut[2 * i + 1] = baq4(theIn[i].imag(), aRms, 1.0 / aRms, aSaturated);
        }
    }
    return aSaturated;
}

void fqorvSimPutBE16(uint8_t* theOut, uint16_t theValue)
{
    theOut[0] = static_cast<uint8_t>(theValue >> 8);
    theOut[1] = static_cast<uint8_t>(theValue);
}

void fqorvSimPutBE32(uint8_t* theOut, uint32_t theValue)
{
    theOut[0] = static_cast<uint8_t>(theValue >> 24);
    theOut[1] = static_cast<uint8_t>(theValue >> 16);
    theOut[2] = static_cast<uint8_t>(theValue >> 8);
    theOut[3] = static_cast<uint8_t>(theValue);
}

uint16_t fqorvSimGetBE16(const uint8_t* theIn) { return static_cast<uint16_t>((theIn[0] << 8) | theIn[1]); }

uint32_t fqorvSimGetBE32(const uint8_t* theIn)
{
    return (static_cast<uint32_t>(theIn[0]) << 24) | (static_cast<uint32_t>(theIn[1]) << 16) |
           (static_cast<uint32_t>(theIn[2]) << 8) | theIn[3];
}

void fqorvSimEncodePrefix(const CSimPrefixLayout& theLayout, const CSimPrefixValues& theValues, uint64_t theSeed,
                          uint64_t theRecord, uint8_t* theOut)
{
    CSimRandom aRandom(theSeed, CQORV_SIM_STREAM_PREFIX, theRecord);
    for (int i = 0; i < theLayout.mSize; i += 8) {
        const uint64_t r = aRandom.next();
        for (int j = 0; j < 8 && i + j < theLayout.mSize; ++j) theOut[i + j] = static_cast<uint8_t>(r >> (8 * j));
    }
    if (theLayout.mCounterPos >= 0) fqorvSimPutBE32(theOut + theLayout.mCounterPos, theValues.mCounter);
    if (theLayout.mSwstPos >= 0)
        fqorvSimPutBE16(theOut + theLayout.mSwstPos, static_cast<uint16_t>(static_cast<int16_t>(theValues.mSwstCode)));
    if (theLayout.mPriPos >= 0) fqorvSimPutBE16(theOut + theLayout.mPriPos, static_cast<uint16_t>(theValues.mPriCode));
    if (theLayout.mRangePos >= 0)
        fqorvSimPutBE32(theOut + theLayout.mRangePos, static_cast<uint32_t>(theValues.mSlantRange));
}
