#include "qorv_sim_timeline.h"

#include <algorithm>
#include <cmath>

#include "qorv_sim_asar.h"

CSimTimeline::CSimTimeline(const CSimScene& theScene)
    : mPulses(theScene.mPulses),
      mTauFirst(theScene.mTauFirst),
      mSamplingRate(theScene.mRadar.mSamplingRate),
      mSamplesPerCode(theScene.mPrefix.mSwstSamplesPerCode),
      mSwstCode0(theScene.mSwstCode0),
      // An ERS archive times the window from the pulse 9 PRIs earlier, an ASAR one from the pulse
      // of its beam's rank; the chain's raw products and ALOS records state the window of the pulse
      // itself.
      mWindowRank(theScene.mArchive == CSimArchive::Ceos || theScene.mArchive == CSimArchive::Envisat ? NQORV_ERS::RANK
                  : theScene.mArchive == CSimArchive::Asar                                          ? fqorvSimAsarRank(theScene)
                                                                                                     : 0)
{
    // PRI segments: the first PRF, then one segment per change in pulse order.
    std::vector<std::pair<long, int>> aChanges = theScene.mFaults.mPrfChanges;
    std::sort(aChanges.begin(), aChanges.end());
    mSegments.push_back({0, theScene.mStartTime, 1.0 / theScene.mRadar.mPrf, theScene.mRadar.mPriCode});
    for (const auto& [aPulse, aCode] : aChanges) {
        const PriSegment& aLast = mSegments.back();
        const double aStart = aLast.mStart + static_cast<double>(aPulse - aLast.mFirst) * aLast.mPri;
        mSegments.push_back({aPulse, aStart, 1.0 / fqorvSimPrfOfCode(theScene.mPrefix, theScene.mRadar.mSamplingRate, aCode), aCode});
    }
    mSwstSteps = theScene.mFaults.mSwstChanges;
    std::sort(mSwstSteps.begin(), mSwstSteps.end());

    std::vector<long> aDropped = theScene.mFaults.mDroppedPulses;
    std::vector<long> aRepeated = theScene.mFaults.mRepeatedPulses;
    std::sort(aDropped.begin(), aDropped.end());
    std::sort(aRepeated.begin(), aRepeated.end());
    mRecords.reserve(static_cast<std::size_t>(mPulses) + aRepeated.size());
    for (long k = 0; k < mPulses; ++k) {
        if (std::binary_search(aDropped.begin(), aDropped.end(), k)) continue;
        const uint32_t aCounter = static_cast<uint32_t>(theScene.mCounter0 + k);
        mRecords.push_back({k, aCounter, false});
        if (std::binary_search(aRepeated.begin(), aRepeated.end(), k)) mRecords.push_back({k, aCounter, true});
    }
}

const CSimTimeline::PriSegment& CSimTimeline::segmentOf(long k) const
{
    auto it = std::upper_bound(mSegments.begin(), mSegments.end(), k,
                               [](long v, const PriSegment& s) { return v < s.mFirst; });
    return it == mSegments.begin() ? mSegments.front() : *(it - 1);
}

double CSimTimeline::pulseTime(long k) const
{
    const PriSegment& s = segmentOf(k);
    return s.mStart + static_cast<double>(k - s.mFirst) * s.mPri;
}

int CSimTimeline::priCode(long k) const { return segmentOf(k).mCode; }

double CSimTimeline::prf(long k) const { return 1.0 / segmentOf(k).mPri; }

int CSimTimeline::swstCode(long k) const
{
    int aCode = mSwstCode0;
    for (const auto& [aPulse, aStep] : mSwstSteps) {
        if (aPulse > k) break;
        aCode += aStep;
    }
    return aCode;
}

int CSimTimeline::windowShiftSamples(long k) const { return (swstCode(k) - mSwstCode0) * mSamplesPerCode; }

double CSimTimeline::windowDelay(long k) const
{
    const double aRankShift = mWindowRank * (segmentOf(k).mPri - mSegments.front().mPri);
    return mTauFirst + windowShiftSamples(k) / mSamplingRate + aRankShift;
}

double CSimTimeline::fractionalPulse(double theTime) const
{
    // The last segment that starts at or before the time (the first one before the start).
    std::size_t i = 0;
    while (i + 1 < mSegments.size() && mSegments[i + 1].mStart <= theTime) ++i;
    const PriSegment& s = mSegments[i];
    return static_cast<double>(s.mFirst) + (theTime - s.mStart) / s.mPri;
}

double CSimTimeline::timeOfPulse(double thePulse) const
{
    std::size_t i = 0;
    while (i + 1 < mSegments.size() && static_cast<double>(mSegments[i + 1].mFirst) <= thePulse) ++i;
    const PriSegment& s = mSegments[i];
    return s.mStart + (thePulse - static_cast<double>(s.mFirst)) * s.mPri;
}

long CSimTimeline::recordOfPulse(long k) const
{
    auto it = std::lower_bound(mRecords.begin(), mRecords.end(), k,
                               [](const CSimRecord& r, long v) { return r.mPulse < v; });
    if (it == mRecords.end() || it->mPulse != k) return -1;
    return static_cast<long>(it - mRecords.begin());
}
