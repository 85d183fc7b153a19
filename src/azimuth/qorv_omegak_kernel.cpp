// The omega-k block focuser.
#include "qorv_omegak_kernel.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "qorv_bessel.h"
#include "qorv_enviroment.h"

namespace {

constexpr double CSAR_C = 299792458.0;
const double aTwoPi = 2.0 * M_PI;
// Rows between two exact evaluations of the phase recurrences; bounds their rounding drift.
constexpr int CQORV_RECURRENCE_RESEED = 256;
// Columns handled together by one thread in the reference phase.
constexpr int CQORV_PHASE_CHUNK = 256;
// Columns between two exact evaluations of the precise mode's column phase.
constexpr int CQORV_COLUMN_NODE = 32;

}  // namespace

int fqorvDopplerBin(double theWs2, int theAzimuthFftSize)
{
    const double x = theAzimuthFftSize * theWs2 / aTwoPi;
    const long aNint = x > 0.0 ? static_cast<long>(x + 0.5) : static_cast<long>(x - 0.5);
    long aBin = aNint % theAzimuthFftSize;
    if (aBin < 0) aBin += theAzimuthFftSize;
    return static_cast<int>(aBin);
}

COmegaKBlockFocuser::COmegaKBlockFocuser(const COmegaKParam& theParam, int theThreads)
    : mParam(theParam),
      mThreads(std::max(theThreads, 1)),
      mBlock(theParam.mAzimuthFftSize, theParam.mRangeFftSize),
      mAzimuthPlan(theParam.mAzimuthFftSize, theParam.mRangeFftSize, FftDirection::Forward, true),
      mRangePlan(theParam.mRangeFftSize, FftDirection::Forward)
{
    const int nazft = mParam.mAzimuthFftSize;
    const int nrfft = mParam.mRangeFftSize;
    mK0 = aTwoPi * mParam.mCarrierFrequency / mParam.mSamplingRate;
    mNearSamples = 2.0 * mParam.mNearRange * mParam.mSamplingRate / CSAR_C;
    // The reference range: the near range, or the block's middle column in the precise mode, which
    // halves the residual of the first-order mapping at the block's edges.
    mReferenceColumn = mParam.mPrecise ? 0.5 * nrfft : 0.0;
    const double nr0 = mNearSamples + mReferenceColumn;  // reference range in samples
    mKr.resize(nrfft);
    mInverseKr.resize(nrfft);
    for (int n = 0; n < nrfft; ++n) {
        const int g = n <= nrfft / 2 ? n : n - nrfft;
        const double w = aTwoPi * g / nrfft;
        mKr[n] = 2.0 * (mK0 + w) / nr0;
        mInverseKr[n] = 1.0 / mKr[n];
    }
    // The unscaled transforms leave a factor nazft * nrfft on the block; the reference phase removes it.
    mScale = 1.0 / (static_cast<double>(nazft) * nrfft);
    mKx.assign(nazft, 0.0);
    mKx2.assign(nazft, 0.0);
    mAz.assign(nazft, 0.0);
    mWeight.assign(nazft, 0.0f);
    if (mParam.mPrecise) {
        mRangeInversePlan = std::make_unique<FftPlan1D>(nrfft, FftDirection::Inverse);
        mAzimuthInversePlan = std::make_unique<FftPlanColumns>(nazft, nrfft, FftDirection::Inverse, true);
        mVelocityRatio2.assign(nrfft, 1.0);
    } else {
        mInversePlan = std::make_unique<FftPlan2D>(nazft, nrfft, FftDirection::Inverse, true);
    }
}

void COmegaKBlockFocuser::setColumnVelocities(const std::vector<double>& theVelocities)
{
    for (int n = 0; n < mParam.mRangeFftSize; ++n) {
        const double aRatio = mParam.mVelocity / theVelocities.at(n);
        mVelocityRatio2[n] = aRatio * aRatio;
    }
}

int COmegaKBlockFocuser::signedBinDistance(int b) const
{
    const int nazft = mParam.mAzimuthFftSize;
    int q = b - mDopplerBin;
    if (q > nazft / 2) q -= nazft;
    if (q < -nazft / 2) q += nazft;
    return q;
}

double COmegaKBlockFocuser::binFrequency(int b) const
{
    const double aDecimatedRate = static_cast<double>(mParam.mPresumming) * mParam.mDecimation * mParam.mAzimuthFftSize;
    return (signedBinDistance(b) / aDecimatedRate) * mParam.mPrf + mCentroid;
}

double COmegaKBlockFocuser::halfShift(int b) const
{
    if (!mParam.mHalfPixelShift) return 0.0;
    const int nazft = mParam.mAzimuthFftSize;
    return b <= nazft / 2 ? -M_PI * b / nazft : -M_PI * (b - nazft) / nazft;
}

void COmegaKBlockFocuser::setDoppler(double theCentroid, int theDopplerBin, double theShift)
{
    const int nazft = mParam.mAzimuthFftSize;
    mCentroid = theCentroid;
    if (mParam.mPrecise) {
        // Every bin labelled with its own frequency: the centroid moves to the frequency of its bin,
        // within the band of decimated rate around it (at most half a bin).
        const double aRate = mParam.mPrf / (static_cast<double>(mParam.mPresumming) * mParam.mDecimation);
        mCentroid = theCentroid + std::remainder(theDopplerBin * aRate / nazft - theCentroid, aRate);
    }
    mDopplerBin = theDopplerBin;
    mShift = theShift;
    const double dr = CSAR_C / (2.0 * mParam.mSamplingRate);
    for (int b = 0; b < nazft; ++b) {
        const double fa = binFrequency(b);
        // kx: azimuth wavenumber in radians per range sample.
        mKx[b] = (fa / mParam.mVelocity) * aTwoPi * dr;
        mKx2[b] = mKx[b] * mKx[b];
        mAz[b] = aTwoPi * fa / mParam.mPrf;
    }

    std::fill(mWeight.begin(), mWeight.end(), 0.0f);
    mWeight[theDopplerBin] = 1.0f;
    const int nband = static_cast<int>(nazft * mParam.mBandFraction);
    const double aNorm = besselI0(CQORV_KAISER_BETA_WEIGHT);
    for (int t = 1; t <= nband / 2; ++t) {
        const double x = 2.0 * t / nband;
        const float aValue = static_cast<float>(besselI0(CQORV_KAISER_BETA_WEIGHT * std::sqrt(1.0 - x * x)) / aNorm);
        int aUp = theDopplerBin + t;
        if (aUp >= nazft) aUp -= nazft;
        int aDown = theDopplerBin - t;
        if (aDown < 0) aDown += nazft;
        if (aUp < 0 || aUp >= nazft) {
            fdfTrace("ERROR AZ ACESS 1 : %d\n", aUp);
            aUp = 0;
        }
        if (aDown < 0 || aDown >= nazft) {
            fdfTrace("ERROR AZ ACESS 2 : %d\n", aDown);
            aDown = 0;
        }
        mWeight[aUp] = aValue;
        mWeight[aDown] = aValue;
    }
}

void COmegaKBlockFocuser::focus()
{
    fdfTrace("Forward azimuth FFT\n");
    azimuthTransform();
    fdfTrace("Stolt interpolation \n");
    stoltMapping();
    fdfTrace("Forward range FFT \n");
    rangeTransform();
    fdfTrace("Data compression \n");
    referencePhase();
    if (!mParam.mPrecise) {
        inverseTransform();
        return;
    }
    rangeInverseTransform();
    fdfTrace("Azimuth phase per range column \n");
    columnPhase();
    azimuthInverseTransform();
}

void COmegaKBlockFocuser::azimuthTransform() { mAzimuthPlan.execute(mBlock.data()); }

void COmegaKBlockFocuser::stoltMapping()
{
    const int nazft = mParam.mAzimuthFftSize;
    const int nrfft = mParam.mRangeFftSize;
    // A range-frequency shift proportional to kx^2: the row is multiplied by exp(j a n), built by a
    // single-precision phasor recurrence (no sine or cosine per sample).
#pragma omp parallel for num_threads(mThreads) schedule(static)
    for (int b = 0; b < nazft; ++b) {
        const double a = -mKx2[b] / (2.0 * mK0);
        const float aRotRe = static_cast<float>(std::cos(a));
        const float aRotIm = static_cast<float>(std::sin(a));
        // The phase is zero at the reference column.
        float aRe = 1.0f, aIm = 0.0f;
        if (mReferenceColumn != 0.0) {
            aRe = static_cast<float>(std::cos(-a * mReferenceColumn));
            aIm = static_cast<float>(std::sin(-a * mReferenceColumn));
        }
        fcomplex* aRow = mBlock[b];
        for (int n = 0; n < nrfft; ++n) {
            const float sRe = aRow[n].real(), sIm = aRow[n].imag();
            aRow[n] = fcomplex(sRe * aRe - sIm * aIm, sRe * aIm + sIm * aRe);
            const float aNextRe = aRe * aRotRe - aIm * aRotIm;
            aIm = aRe * aRotIm + aIm * aRotRe;
            aRe = aNextRe;
        }
    }
}

void COmegaKBlockFocuser::rangeTransform()
{
    const int nazft = mParam.mAzimuthFftSize;
#pragma omp parallel for num_threads(mThreads) schedule(static)
    for (int b = 0; b < nazft; ++b) mRangePlan.execute(mBlock[b]);
}

void COmegaKBlockFocuser::referencePhaseDirect()
{
    const int nazft = mParam.mAzimuthFftSize;
    const int nrfft = mParam.mRangeFftSize;
    for (int b = 0; b < nazft; ++b) {
        const double aRowPhase = -mShift * mAz[b] + halfShift(b);
        fcomplex* aRow = mBlock[b];
        for (int n = 0; n < nrfft; ++n) {
            const double aPhase = -mKx2[b] / mKr[n] + aRowPhase;
            const fcomplex aFactor(static_cast<float>(mScale * std::cos(aPhase)),
                                   static_cast<float>(mScale * std::sin(aPhase)));
            aRow[n] = (aRow[n] * mWeight[b]) * aFactor;
        }
    }
}

void COmegaKBlockFocuser::referencePhase()
{
    const int nazft = mParam.mAzimuthFftSize;
    const int nrfft = mParam.mRangeFftSize;
    // The phase -kx2[b] / kr[n] is quadratic in the signed bin distance q at each range bin, so along
    // q it follows a second-order recurrence: P <- P R, R <- R D, in double precision, restarted
    // from the exact value every CQORV_RECURRENCE_RESEED rows. Rows of zero weight are cleared.
    std::vector<std::pair<int, int>> aRows;  // (q, b) of the weighted bins, by increasing q
    for (int b = 0; b < nazft; ++b) {
        if (mWeight[b] != 0.0f) aRows.emplace_back(signedBinDistance(b), b);
        else std::fill(mBlock[b], mBlock[b] + nrfft, fcomplex(0.0f, 0.0f));
    }
    std::sort(aRows.begin(), aRows.end());
    std::vector<dcomplex> aRowFactor(aRows.size());
    for (std::size_t k = 0; k < aRows.size(); ++k) {
        const int b = aRows[k].second;
        aRowFactor[k] = std::polar(mScale, -mShift * mAz[b] + halfShift(b));
    }
    // kx as a function of q: kx = aKappa (q aStep + fdc).
    const double dr = CSAR_C / (2.0 * mParam.mSamplingRate);
    const double aKappa = aTwoPi * dr / mParam.mVelocity;
    const double aStep = mParam.mPrf / (static_cast<double>(mParam.mPresumming) * mParam.mDecimation * nazft);
    auto aPhaseAt = [&](double q, int n) {
        const double kx = aKappa * (q * aStep + mCentroid);
        return -(kx * kx) / mKr[n];
    };
    const int aChunks = (nrfft + CQORV_PHASE_CHUNK - 1) / CQORV_PHASE_CHUNK;

#pragma omp parallel for num_threads(mThreads) schedule(static)
    for (int c = 0; c < aChunks; ++c) {
        const int n0 = c * CQORV_PHASE_CHUNK;
        const int n1 = std::min(n0 + CQORV_PHASE_CHUNK, nrfft);
        const int aCount = n1 - n0;
        std::vector<double> pRe(aCount), pIm(aCount), rRe(aCount), rIm(aCount), dRe(aCount), dIm(aCount);
        for (int j = 0; j < aCount; ++j) {
            const double aSecond = -2.0 * aKappa * aKappa * aStep * aStep * mInverseKr[n0 + j];
            dRe[j] = std::cos(aSecond);
            dIm[j] = std::sin(aSecond);
        }
        int aLastQ = 0;
        for (std::size_t k = 0; k < aRows.size(); ++k) {
            const int q = aRows[k].first;
            if (k % CQORV_RECURRENCE_RESEED == 0 || q != aLastQ + 1) {
                for (int j = 0; j < aCount; ++j) {
                    const double p0 = aPhaseAt(q, n0 + j);
                    const double p1 = aPhaseAt(q + 1, n0 + j);
                    pRe[j] = std::cos(p0);
                    pIm[j] = std::sin(p0);
                    rRe[j] = std::cos(p1 - p0);
                    rIm[j] = std::sin(p1 - p0);
                }
            }
            aLastQ = q;
            const int b = aRows[k].second;
            const float aWeight = mWeight[b];
            const double eRe = aRowFactor[k].real(), eIm = aRowFactor[k].imag();
            fcomplex* aRow = mBlock[b] + n0;
            for (int j = 0; j < aCount; ++j) {
                const float fRe = static_cast<float>(eRe * pRe[j] - eIm * pIm[j]);
                const float fIm = static_cast<float>(eRe * pIm[j] + eIm * pRe[j]);
                const float sRe = aRow[j].real() * aWeight, sIm = aRow[j].imag() * aWeight;
                aRow[j] = fcomplex(sRe * fRe - sIm * fIm, sRe * fIm + sIm * fRe);
                const double aNextRe = pRe[j] * rRe[j] - pIm[j] * rIm[j];
                pIm[j] = pRe[j] * rIm[j] + pIm[j] * rRe[j];
                pRe[j] = aNextRe;
                const double aNextR = rRe[j] * dRe[j] - rIm[j] * dIm[j];
                rIm[j] = rRe[j] * dIm[j] + rIm[j] * dRe[j];
                rRe[j] = aNextR;
            }
        }
    }
}

void COmegaKBlockFocuser::inverseTransform() { mInversePlan->execute(mBlock.data()); }

void COmegaKBlockFocuser::rangeInverseTransform()
{
    const int nazft = mParam.mAzimuthFftSize;
#pragma omp parallel for num_threads(mThreads) schedule(static)
    for (int b = 0; b < nazft; ++b)
        if (mWeight[b] != 0.0f) mRangeInversePlan->execute(mBlock[b]);
}

void COmegaKBlockFocuser::azimuthInverseTransform() { mAzimuthInversePlan->execute(mBlock.data()); }

double COmegaKBlockFocuser::residualPhase(double theKx, int theColumn) const
{
    // After the block stages a target at column n keeps, at the centre of the range band, the phase
    // n0 (k0 - sqrt((k0 + d)^2 - kt^2)) with n0 its range in samples, d = kx^2 / (2 k0) the shift of
    // the first-order mapping and kt = kx v / Vr its true azimuth wavenumber: the quartic and higher
    // terms of the hyperbola and the difference between the processing and the effective velocity.
    const double k0 = mK0;
    const double aKx2 = theKx * theKx;
    const double d = aKx2 / (2.0 * k0);
    const double aExcess = aKx2 * (1.0 - mVelocityRatio2[theColumn]) + d * d;  // (k0 + d)^2 - kt^2 - k0^2
    const double n0 = mNearSamples + theColumn;
    return -n0 * aExcess / (k0 + std::sqrt(k0 * k0 + aExcess));
}

void COmegaKBlockFocuser::columnPhase()
{
    const int nazft = mParam.mAzimuthFftSize;
    const int nrfft = mParam.mRangeFftSize;
    // The phase is smooth across range: exact every CQORV_COLUMN_NODE columns, linear between them
    // through a double-precision phasor (its curvature leaves far below a milliradian).
#pragma omp parallel for num_threads(mThreads) schedule(static)
    for (int b = 0; b < nazft; ++b) {
        if (mWeight[b] == 0.0f) continue;
        fcomplex* aRow = mBlock[b];
        const double aKx = mKx[b];
        double aAtStart = residualPhase(aKx, 0);
        for (int n0 = 0; n0 < nrfft; n0 += CQORV_COLUMN_NODE) {
            const int n1 = std::min(n0 + CQORV_COLUMN_NODE, nrfft - 1);
            const double aAtEnd = residualPhase(aKx, n1);
            const double aStep = n1 > n0 ? -(aAtEnd - aAtStart) / (n1 - n0) : 0.0;
            double pRe = std::cos(-aAtStart), pIm = std::sin(-aAtStart);
            const double rRe = std::cos(aStep), rIm = std::sin(aStep);
            const int aEnd = std::min(n0 + CQORV_COLUMN_NODE, nrfft);
            for (int n = n0; n < aEnd; ++n) {
                const float fRe = static_cast<float>(pRe), fIm = static_cast<float>(pIm);
                const float sRe = aRow[n].real(), sIm = aRow[n].imag();
                aRow[n] = fcomplex(sRe * fRe - sIm * fIm, sRe * fIm + sIm * fRe);
                const double aNextRe = pRe * rRe - pIm * rIm;
                pIm = pRe * rIm + pIm * rRe;
                pRe = aNextRe;
            }
            aAtStart = aAtEnd;
        }
    }
}

void COmegaKBlockFocuser::clearGuards(int theColumn, int theM1, int theM2)
{
    const int nazft = mParam.mAzimuthFftSize;
    const int aTop = std::min(std::max(theM1, 0), nazft);
    for (int r = 0; r < aTop; ++r) mBlock[r][theColumn] = fcomplex(0.0f, 0.0f);
    for (int r = std::max(nazft - std::max(theM2, 0), 0); r < nazft; ++r) mBlock[r][theColumn] = fcomplex(0.0f, 0.0f);
}
