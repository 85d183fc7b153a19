#include "qorv_line_continuity.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdarg>
#include <cstdlib>

#include "qorv_enviroment.h"
#include "qorv_identifiers.h"

int32_t fqorvBigEndian32(const uint8_t* theBytes)
{
    const uint32_t v = (static_cast<uint32_t>(theBytes[0]) << 24) | (static_cast<uint32_t>(theBytes[1]) << 16) |
                       (static_cast<uint32_t>(theBytes[2]) << 8) | static_cast<uint32_t>(theBytes[3]);
    return static_cast<int32_t>(v);
}

int16_t fqorvBigEndian16(const uint8_t* theBytes)
{
    return static_cast<int16_t>((static_cast<uint16_t>(theBytes[0]) << 8) | static_cast<uint16_t>(theBytes[1]));
}

namespace {

bool fIsErs(int theSensor) { return theSensor == CSAR_SENSOR_ERS1_ID || theSensor == CSAR_SENSOR_ERS2_ID; }

/// Rounds half away from zero.
int32_t fRound(double x)
{
    const double r = x >= 0.0 ? std::floor(x + 0.5) : -std::floor(-x + 0.5);
    return static_cast<int32_t>(std::clamp(r, -2147483647.0, 2147483647.0));
}

}  // namespace

CLineContinuity::CLineContinuity(const CContinuityLayout& theLayout, FILE* theTrace, FILE* theSwstOnly)
    : mLayout(theLayout), mTrace(theTrace), mSwstOnly(theSwstOnly)
{
}

void CLineContinuity::defaultPositions(int theSensor, int& theCounterPos, int& theSwstPos)
{
    theCounterPos = theSwstPos = -1;
    if (fIsErs(theSensor)) {
        theCounterPos = 210;
        theSwstPos = 214;
    } else if (theSensor == CSAR_SENSOR_ENVISAT1_ID) {
        theCounterPos = 54;
        theSwstPos = 58;
    } else if (theSensor == CSAR_SENSOR_JERS1_ID || theSensor == CSAR_SENSOR_ALOS_PALSAR_ID) {
        theCounterPos = 12;
    }
}

bool CLineContinuity::isChecked(int theSensor)
{
    return fIsErs(theSensor) || theSensor == CSAR_SENSOR_JERS1_ID || theSensor == CSAR_SENSOR_ENVISAT1_ID ||
           theSensor == CSAR_SENSOR_ALOS_PALSAR_ID;
}

bool CLineContinuity::hasSlantRange(int theProduct)
{
    switch (theProduct) {
    case CQORV_ORIG_PROD_JERS_1_RAW_ID:
    case CQORV_ORIG_PROD_ALOS_PALSAR_PLR10_ID:
    case CQORV_ORIG_PROD_ALOS_PALSAR_FBS10_ID:
    case CQORV_ORIG_PROD_ALOS_PALSAR_FBD10_ID:
    case CQORV_ORIG_PROD_ALOS_PALSAR_ERSDAC_PLR10_ID:
    case CQORV_ORIG_PROD_ALOS_PALSAR_ERSDAC_FBS10_ID:
    case CQORV_ORIG_PROD_ALOS_PALSAR_ERSDAC_FBD10_ID:
        return true;
    default:
        return false;
    }
}

void CLineContinuity::traceBoth(const char* theFormat, ...)
{
    char aText[512];
    va_list aArgs;
    va_start(aArgs, theFormat);
    std::vsnprintf(aText, sizeof aText, theFormat, aArgs);
    va_end(aArgs);
    fdfTrace("%s", aText);
    if (mTrace) std::fputs(aText, mTrace);
}

void CLineContinuity::rememberGap(int theStep, int theLine)
{
    if (theStep > mLargestGap) {
        mLargestGap = theStep;
        mLargestGapLine = theLine;
    }
}

CContinuityDecision CLineContinuity::check(const uint8_t* thePrefix, CContinuityRoad theRoad, int theLine, int theRecord)
{
    CContinuityDecision aDecision;
    if (!isChecked(mLayout.mSensor) || mLayout.mCounterPos < 0) return aDecision;
    mLineCounter = fqorvBigEndian32(thePrefix + mLayout.mCounterPos);
    const bool aErsEnvisat = fIsErs(mLayout.mSensor) || mLayout.mSensor == CSAR_SENSOR_ENVISAT1_ID;
    // At priming the rows before the first record may stay empty: its row number is no test.
    const int aLine = theRoad == CContinuityRoad::Priming && !mAccepted ? 0 : theLine;
    aDecision = aErsEnvisat ? checkErsEnvisat(theRoad, aLine, theRecord) : checkJersAlos(aLine);
    aDecision.mFillerShift = aDecision.mShift = mShift;
    if (aDecision.mDrop) return aDecision;
    mAccepted = true;
    if (hasSlantRange(mLayout.mProduct)) {
        checkSlantRange(thePrefix, theLine);
    } else if (mLayout.mSwstPos >= 0) {
        checkSwst(thePrefix, theRoad, theLine);
    }
    if (mSwstOnly)
        std::fprintf(mSwstOnly, "%d\t\tLC: %d\t%d\t%d\t%d\n", theRecord, mLineCounter, mSwstCounter, mSwstStep, mShift);
    aDecision.mShift = mShift;
    return aDecision;
}

CContinuityDecision CLineContinuity::checkErsEnvisat(CContinuityRoad theRoad, int theLine, int theRecord)
{
    CContinuityDecision aDecision;
    const bool aErs = fIsErs(mLayout.mSensor);
    const int64_t aWide = static_cast<int64_t>(mLineCounter) - mLastLine;
    const int32_t aStep = static_cast<int32_t>(std::clamp<int64_t>(aWide, INT32_MIN, INT32_MAX));
    if (aStep > 1 && theLine != 0) {
        rememberGap(aStep, theLine);
        ++mGapEvents;
        mLostLines += aStep - 1;
        const char* aWords = theRoad == CContinuityRoad::Direct
                                 ? (aErs ? "ERS WARNING 3 :  lc : " : "\nENVISAT WARNING :  lc : ")
                                 : theRoad == CContinuityRoad::Priming ? (aErs ? "ERS WARNING : lc : " : "ENVISAT WARNING : lc : ")
                                                                        : (aErs ? "ERS WARNING 2:  lc : " : "ENVISAT WARNING 2:  lc : ");
        traceBoth("%s%d ;  ll : %d  ;  (line_counter-last_line)  : %d  ;  (line_step)  : %d missing line(s) detected at line: %d\n",
                  aWords, mLineCounter, mLastLine, aStep, aStep - 1, theLine);
        // Beyond 30 the counter is not trusted: nothing is filled and the last line stays, so the
        // following records report a gap too until the counter comes back in reach.
        if (aStep <= 30) {
            (theRoad == CContinuityRoad::Direct ? aDecision.mFillers : aDecision.mSkip) = aStep - 1;
            mLastLine = mLineCounter;
        }
    } else if (aStep < 1) {
        const char* aWords = theRoad == CContinuityRoad::Priming ? (aErs ? "ERS NEGATIVE  WARNING : lc : " : "ENVISAT NEGATIVE  WARNING : lc : ")
                                                                 : (aErs ? "ERS WARNING 3 :  lc : " : "ENVISAT WARNING 3 :  lc : ");
        traceBoth("%s%d duplicate line line(s) detected at line: %d  ;  aActRow  : %d\n", aWords, mLineCounter, theLine,
                  theRecord);
        aDecision.mDrop = true;
    } else {
        mLastLine = mLineCounter;
    }
    return aDecision;
}

CContinuityDecision CLineContinuity::checkJersAlos(int theLine)
{
    CContinuityDecision aDecision;
    const int64_t aWide = static_cast<int64_t>(mLineCounter) - mLastLine;
    const int32_t aDifference = static_cast<int32_t>(std::clamp<int64_t>(aWide, -INT32_MAX, INT32_MAX));
    const int32_t aStep = std::abs(aDifference);
    if (aStep != 1 && theLine != 0) {
        rememberGap(aStep, theLine);
        traceBoth("JERS WARNING: %d missing line(s) detected at line: %d  ;  LAST : %d  ->   COUNTER : %d\n", aStep - 1,
                  theLine, mLastLine, mLineCounter);
        if (aDifference >= 1 && aDifference <= 30) aDecision.mSkip = aStep - 1;
    }
    mLastLine = mLineCounter;
    return aDecision;
}

void CLineContinuity::checkSwst(const uint8_t* thePrefix, CContinuityRoad theRoad, int theLine)
{
    mSwstCounter = fqorvBigEndian16(thePrefix + mLayout.mSwstPos);
    const bool aFirst = theRoad == CContinuityRoad::Priming ? mFirstSwst == -9999 : theLine == 0;
    if (aFirst) {
        mFirstSwst = mSwstCounter;
        mSwstStep = 0;
        mShift = 0;
    }
    const int32_t d = mSwstCounter - mFirstSwst;
    if (mSwstStep == d) return;
    if (fIsErs(mLayout.mSensor)) {
        if (d % 22 == 0) {
            mSwstStep = d;
            traceBoth("WARNING: %d swst code change detected at line: %d\n", d, theLine);
            if (std::abs(d) < 1000) mShift = 4 * d;
        } else {
            traceBoth(theRoad == CContinuityRoad::Refill ? "WARNING: %d swst code change NOT detected at line: %d\n"
                                                         : "WARNING: %d swst code change NO detected at line: %d\n",
                      d, theLine);
        }
    } else {
        mSwstStep = d;
        traceBoth(theRoad == CContinuityRoad::Direct ? "TBD WARNING ENVISAT :%d swst code change detected at line: %d\n"
                                                     : "WARNING ENVISAT 1 : %d swst code change detected at line: %d\n",
                  d, theLine);
        if (std::abs(d) < 1000) mShift = d;
    }
}

void CLineContinuity::checkSlantRange(const uint8_t* thePrefix, int theLine)
{
    double aRange = static_cast<double>(fqorvBigEndian32(thePrefix + 116));
    if (theLine == 0 || mFirstRange < 0.0) {
        mFirstRange = mLastRange = aRange;
        mSwstCounter = mFirstSwst = mSwstStep = mShift = 0;
        return;
    }
    mSwstCounter = fRound((aRange - mFirstRange) / mLayout.mPixelSpacing);
    if (mLayout.mProduct == CQORV_ORIG_PROD_JERS_1_RAW_ID) return;
    if (std::abs(mSwstCounter) >= mLayout.mRangeOut / 2) {
        // A wild value: the earlier range and the earlier shift stay.
        aRange = mLastRange;
        mSwstCounter = mFirstSwst + mSwstStep;
    }
    mLastRange = aRange;
    fdfTrace(": ACT_SR : %f SR0 : %f aPixelSpacingRg : %f swst_counter : %d\n", aRange, mFirstRange,
             mLayout.mPixelSpacing, mSwstCounter);
    const int32_t d = mSwstCounter - mFirstSwst;
    if (d != mSwstStep) {
        mSwstStep = mShift = d;
        traceBoth("WARNING: %d swst null  code change detected at line: %d swst step  ;  %d\n", d, theLine, mSwstStep);
    }
}
