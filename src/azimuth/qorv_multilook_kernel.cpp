// Detection and averaging of look rectangles.
#include "qorv_multilook_kernel.h"

#include "qorv_generic_utility.h"

CMultiLookAverager::CMultiLookAverager(int theInputWidth, int theRangeLooks, double theInputNull, float theOutputNull)
    : mInputWidth(theInputWidth),
      mRangeLooks(theRangeLooks),
      mOutputWidth(theInputWidth / theRangeLooks),
      mInputNull(theInputNull),
      mOutputNull(theOutputNull),
      mSum(static_cast<std::size_t>(mOutputWidth), 0.0),
      mCount(static_cast<std::size_t>(mOutputWidth), 0)
{
}

void CMultiLookAverager::addLine(const double* thePower)
{
    for (int x = 0; x < mOutputWidth; ++x) {
        const double* aCell = thePower + static_cast<std::size_t>(x) * mRangeLooks;
        double aSum = 0.0;
        int aCount = 0;
        for (int j = 0; j < mRangeLooks; ++j) {
            if (NQORV_UTILITY::isNullValue(aCell[j], mInputNull)) continue;
            aSum += aCell[j];
            ++aCount;
        }
        mSum[x] += aSum;
        mCount[x] += aCount;
    }
}

void CMultiLookAverager::takeLine(float* theOut)
{
    for (int x = 0; x < mOutputWidth; ++x) {
        theOut[x] = mCount[x] > 0 ? static_cast<float>(mSum[x] / mCount[x]) : mOutputNull;
        mSum[x] = 0.0;
        mCount[x] = 0;
    }
}

void fqorvSubapertureLookLine(const fcomplex* theRows, int theAzimuthLooks, int theWidth, int theRangeLooks,
                              int theSubaperture, int theSubapertures, float* theMliLine)
{
    const float aNorm = static_cast<float>(theAzimuthLooks) * theRangeLooks * theSubapertures;
    const int aHalf = theRangeLooks / 2;
    int p = 0;
    for (int x = aHalf; x < theWidth - aHalf; x += theRangeLooks, ++p) {
        float aSum = 0.0f;
        for (int r = 0; r < theAzimuthLooks; ++r) {
            const fcomplex* aCell = theRows + static_cast<std::size_t>(r) * theWidth + (x - aHalf);
            for (int j = 0; j < theRangeLooks; ++j) aSum += std::norm(aCell[j]);
        }
        const float aValue = aSum / aNorm;
        if (theSubaperture == 0)
            theMliLine[p] = aValue;
        else if (aSum == 0.0f || theMliLine[p] == 0.0f)
            theMliLine[p] = 0.0f;
        else
            theMliLine[p] += aValue;
    }
}
