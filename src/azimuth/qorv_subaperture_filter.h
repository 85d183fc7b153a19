// The azimuth band-pass FIR of the look and subaperture roads: input lines through a circular
// buffer of nfir lines, filtered around a subaperture's Doppler centroid and decimated by ndec into
// the rows of a block. Shared by omega-k (subapertures), autofocus and Doppler ambiguity (looks).
#pragma once

#include <cstdio>
#include <functional>
#include <vector>

#include "qorv_complex.h"
#include "qorv_matrix.h"

/// Reads input line theLine into theRow (the block's columns); lines outside the input never come.
using QorvLineReader = std::function<void(int theLine, fcomplex* theRow)>;

class CSubapertureFilter {
public:
    /// A filter of 8 theDecimation + 1 taps over rows of theColumns samples. theListing (may be
    /// null) receives the taps of each fill: "%4d  %12.5le  %12.5le".
    CSubapertureFilter(int theDecimation, int theColumns, std::FILE* theListing);

    int taps() const { return mNfir; }

    /// Fills the block's rows with the filtered, decimated lines from theOffset on: band
    /// theBandwidthRad, centre theCentreRad (radians per input line). Lines stop at theLines -
    /// ndec; rows that get no line stay zero and are reported.
    void fill(const QorvLineReader& theRead, int theLines, int theOffset, double theBandwidthRad, double theCentreRad,
              CQorvMatrix<fcomplex>& theBlock);

private:
    int mNdec;
    int mNfir;
    CQorvMatrix<fcomplex> mBuffer;
    std::vector<fcomplex> mCoef;
    std::FILE* mListing;
};
