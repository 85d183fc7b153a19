#include "qorv_subaperture_filter.h"

#include <algorithm>

#include "qorv_enviroment.h"
#include "qorv_fir.h"

CSubapertureFilter::CSubapertureFilter(int theDecimation, int theColumns, std::FILE* theListing)
    : mNdec(theDecimation), mNfir(8 * theDecimation + 1), mBuffer(mNfir, theColumns), mCoef(2 * mNfir - 1),
      mListing(theListing)
{
}

void CSubapertureFilter::fill(const QorvLineReader& theRead, int theLines, int theOffset, double theBandwidthRad,
                              double theCentreRad, CQorvMatrix<fcomplex>& theBlock)
{
    const std::vector<CFirTap> aTaps = fqorvDesignBandPassFir(mNfir, theBandwidthRad, theCentreRad);
    for (int t = 0; t < mNfir; ++t) {
        mCoef[t] = fcomplex(aTaps[t].mValue);
        if (mListing) std::fprintf(mListing, "%4d  %12.5le  %12.5le\n", t, aTaps[t].mValue.real(), aTaps[t].mValue.imag());
    }
    for (int t = 0; t < mNfir - 1; ++t) mCoef[t + mNfir] = mCoef[t];  // any nfir entries are a rotation
    if (mListing) std::fflush(mListing);

    const int aColumns = static_cast<int>(mBuffer.nCols());
    const int aRows = static_cast<int>(theBlock.nRows());
    const int half = mNfir / 2;
    std::fill(mBuffer.data(), mBuffer.data() + mBuffer.nRows() * mBuffer.nCols(), fcomplex(0.0f, 0.0f));
    for (int k = 0; k <= half - mNdec; ++k)
        if (theOffset + k >= 0 && theOffset + k < theLines) theRead(theOffset + k, mBuffer[half + k]);
    int w = mNfir - mNdec - 1;
    int l = theOffset + half - mNdec;
    int o = 0;
    for (; o < aRows && l < theLines - mNdec; ++o) {
        for (int d = 0; d < mNdec; ++d) {
            w = (w + 1) % mNfir;
            ++l;
            if (l >= 0) theRead(l, mBuffer[w]);
            else std::fill(mBuffer[w], mBuffer[w] + aColumns, fcomplex(0.0f, 0.0f));
            if (l % 1024 == 0) fdfTrace("range line: %d\n", l);
        }
        fcomplex* aOut = theBlock[o];
        std::fill(aOut, aOut + aColumns, fcomplex(0.0f, 0.0f));
        for (int t = 0; t < mNfir; ++t) {
            const fcomplex aTap = mCoef[(mNfir - 1 - w) + t];
            const fcomplex* aIn = mBuffer[t];
            for (int n = 0; n < aColumns; ++n) aOut[n] += aTap * aIn[n];
        }
    }
    if (o < aRows) {
        fdfTrace("Warning: insufficient #prefilter lines for az. FFT size: %d\n", o);
        for (int r = o; r < aRows; ++r) std::fill(theBlock[r], theBlock[r] + aColumns, fcomplex(0.0f, 0.0f));
    }
}
