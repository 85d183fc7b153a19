// Small dense square matrices in double precision with an inverse, for least-squares systems of a
// few unknowns (polynomial fits of low degree).
#pragma once

#include <vector>

#include "qorv_errors.h"  // DSPMathException

/// An n x n matrix of doubles, row-major.
class CSmallMatrix {
public:
    explicit CSmallMatrix(int n) : mN(n), mData(static_cast<std::size_t>(n) * n, 0.0) {}
    int size() const { return mN; }
    double& operator()(int r, int c) { return mData[static_cast<std::size_t>(r) * mN + c]; }
    double operator()(int r, int c) const { return mData[static_cast<std::size_t>(r) * mN + c]; }

    /// The inverse, by Gauss-Jordan elimination with partial pivoting on the matrix equilibrated by
    /// rows and columns. Throws DSPMathException("Invert of singular matrix") when a pivot of the
    /// equilibrated matrix is not above 1e-13 (entries of order 1).
    CSmallMatrix inverse() const;

    /// The product with a vector of size() values.
    std::vector<double> operator*(const std::vector<double>& theVector) const;

private:
    int mN;
    std::vector<double> mData;
};
