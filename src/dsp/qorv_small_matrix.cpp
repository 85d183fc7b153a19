#include "qorv_small_matrix.h"

#include <cmath>
#include <utility>

namespace {
constexpr double CQORV_SINGULAR_PIVOT = 1e-13;
}

CSmallMatrix CSmallMatrix::inverse() const
{
    const int n = mN;
    // Equilibrate: A' = R A C with R, C diagonal, every row and column of A' of largest entry 1.
    // Then inv(A) = C inv(A') R, and one pivot limit serves matrices of any scale.
    std::vector<double> aRow(n, 0.0), aCol(n, 0.0);
    CSmallMatrix a = *this;
    for (int r = 0; r < n; ++r) {
        for (int c = 0; c < n; ++c) aRow[r] = std::fmax(aRow[r], std::fabs(a(r, c)));
        if (aRow[r] == 0.0) throw DSPMathException("Invert of singular matrix");
        aRow[r] = 1.0 / aRow[r];
        for (int c = 0; c < n; ++c) a(r, c) *= aRow[r];
    }
    for (int c = 0; c < n; ++c) {
        for (int r = 0; r < n; ++r) aCol[c] = std::fmax(aCol[c], std::fabs(a(r, c)));
        if (aCol[c] == 0.0) throw DSPMathException("Invert of singular matrix");
        aCol[c] = 1.0 / aCol[c];
        for (int r = 0; r < n; ++r) a(r, c) *= aCol[c];
    }

    CSmallMatrix aInv(n);
    for (int i = 0; i < n; ++i) aInv(i, i) = 1.0;
    for (int k = 0; k < n; ++k) {
        int p = k;
        for (int r = k + 1; r < n; ++r)
            if (std::fabs(a(r, k)) > std::fabs(a(p, k))) p = r;
        if (!(std::fabs(a(p, k)) > CQORV_SINGULAR_PIVOT)) throw DSPMathException("Invert of singular matrix");
        if (p != k)
            for (int c = 0; c < n; ++c) {
                std::swap(a(p, c), a(k, c));
                std::swap(aInv(p, c), aInv(k, c));
            }
        const double aPivot = a(k, k);
        for (int c = 0; c < n; ++c) {
            a(k, c) /= aPivot;
            aInv(k, c) /= aPivot;
        }
        for (int r = 0; r < n; ++r) {
            if (r == k || a(r, k) == 0.0) continue;
            const double f = a(r, k);
            for (int c = 0; c < n; ++c) {
                a(r, c) -= f * a(k, c);
                aInv(r, c) -= f * aInv(k, c);
            }
        }
    }
    // inv(A) = C inv(A') R.
    for (int r = 0; r < n; ++r)
        for (int c = 0; c < n; ++c) aInv(r, c) *= aCol[r] * aRow[c];
    return aInv;
}

std::vector<double> CSmallMatrix::operator*(const std::vector<double>& theVector) const
{
    std::vector<double> aOut(mN, 0.0);
    for (int r = 0; r < mN; ++r)
        for (int c = 0; c < mN; ++c) aOut[r] += (*this)(r, c) * theVector[c];
    return aOut;
}
