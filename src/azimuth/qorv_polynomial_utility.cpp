#include "qorv_polynomial_utility.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_small_matrix.h"

namespace {

constexpr int CQORV_POLY_ROWS = CQORV_POLY_MAX_ORDER + 1;

/// A value to 80 digits: set from a double (exact) at the working precision.
struct CMp {
    mpfr_t v;
    CMp() { mpfr_init2(v, CQORV_POLY_BITS); mpfr_set_zero(v, 1); }
    ~CMp() { mpfr_clear(v); }
    CMp(const CMp&) = delete;
    CMp& operator=(const CMp&) = delete;
};

/// The solver's work area: power sums S[0 .. 2*order], right-hand sums T[1 .. order+1], the matrix
/// M (1-based rows and columns up to 49), the solution and the pivot limit. Made on first use,
/// released by a call with order 0 and no samples.
struct CSolverWork {
    CMp S[2 * CQORV_POLY_MAX_ORDER + 1];
    CMp T[CQORV_POLY_ROWS + 1];
    CMp M[CQORV_POLY_ROWS + 1][CQORV_POLY_ROWS + 1];
    CMp X[CQORV_POLY_ROWS + 1];
    CMp a, b, tmp, best, limit;
    CSolverWork() { mpfr_set_str(limit.v, "1.0E-40", 10, MPFR_RNDN); }
};

thread_local std::unique_ptr<CSolverWork> tWork;

/// A value to double through a text of 25 significant digits.
double toDouble(const mpfr_t theValue)
{
    char aText[64];
    mpfr_snprintf(aText, sizeof aText, "%.24Re", theValue);
    return std::strtod(aText, nullptr);
}

/// sum c_j x^j at 80 digits into theSum, with thePower as scratch.
void evaluateMp(const mpfr_t* theCoef, int theCount, double x, mpfr_t theSum, mpfr_t thePower, mpfr_t theTmp)
{
    mpfr_set_ui(thePower, 1, MPFR_RNDN);
    mpfr_set_zero(theSum, 1);
    for (int j = 0; j < theCount; ++j) {
        mpfr_mul(theTmp, thePower, theCoef[j], MPFR_RNDN);
        mpfr_add(theSum, theSum, theTmp, MPFR_RNDN);
        mpfr_mul_d(thePower, thePower, x, MPFR_RNDN);
    }
}

/// Elimination with partial pivoting on rows 1 .. np; the solution into w.X[1 .. np].
int eliminate(CSolverWork& w, int np)
{
    for (int k = 1; k <= np; ++k) {
        // A later row replaces the running choice only when strictly larger.
        int p = k;
        mpfr_abs(w.best.v, w.M[k][k].v, MPFR_RNDN);
        for (int i = k + 1; i <= np; ++i) {
            mpfr_abs(w.tmp.v, w.M[i][k].v, MPFR_RNDN);
            if (mpfr_greater_p(w.tmp.v, w.best.v)) {
                mpfr_set(w.best.v, w.tmp.v, MPFR_RNDN);
                p = i;
            }
        }
        if (!mpfr_greater_p(w.best.v, w.limit.v)) return CQORV_POLY_SINGULAR;
        if (k == np) {
            mpfr_div(w.X[np].v, w.T[np].v, w.M[np][np].v, MPFR_RNDN);
            for (int i = np - 1; i >= 1; --i) {
                mpfr_set(w.X[i].v, w.T[i].v, MPFR_RNDN);
                for (int j = i + 1; j <= np; ++j) {
                    mpfr_mul(w.tmp.v, w.M[i][j].v, w.X[j].v, MPFR_RNDN);
                    mpfr_sub(w.X[i].v, w.X[i].v, w.tmp.v, MPFR_RNDN);
                }
            }
            return CQORV_POLY_DONE;
        }
        if (p != k) {
            for (int j = k; j <= np; ++j) mpfr_swap(w.M[p][j].v, w.M[k][j].v);
            mpfr_swap(w.T[p].v, w.T[k].v);
        }
        for (int j = k + 1; j <= np; ++j) mpfr_div(w.M[k][j].v, w.M[k][j].v, w.M[k][k].v, MPFR_RNDN);
        mpfr_div(w.T[k].v, w.T[k].v, w.M[k][k].v, MPFR_RNDN);
        for (int i = k + 1; i <= np; ++i) {
            for (int j = k + 1; j <= np; ++j) {
                mpfr_mul(w.tmp.v, w.M[i][k].v, w.M[k][j].v, MPFR_RNDN);
                mpfr_sub(w.M[i][j].v, w.M[i][j].v, w.tmp.v, MPFR_RNDN);
            }
            mpfr_mul(w.tmp.v, w.M[i][k].v, w.T[k].v, MPFR_RNDN);
            mpfr_sub(w.T[i].v, w.T[i].v, w.tmp.v, MPFR_RNDN);
        }
    }
    return CQORV_POLY_DONE;
}

}  // namespace

int fqorvPolySolve(int theOrder, int n, const double* x, const double* y, double* theCoef, mpfr_t* theCoefMp,
                   int theCheckN, const double* theCheckX, const double* theCheckY)
{
    if (theOrder == 0 && n == 0) {
        tWork.reset();
        return CQORV_POLY_DONE;
    }
    if (theOrder < 1 || theOrder > CQORV_POLY_MAX_ORDER) return CQORV_POLY_ORDER_RANGE;
    if (n < 2) return CQORV_POLY_FEW_SAMPLES;
    if (!tWork) tWork = std::make_unique<CSolverWork>();
    CSolverWork& w = *tWork;
    const int np = theOrder + 1;

    // Normal equations: S[k] = sum x^k, T[k] = sum y x^(k-1).
    for (int k = 0; k <= 2 * theOrder; ++k) mpfr_set_zero(w.S[k].v, 1);
    for (int k = 1; k <= np; ++k) mpfr_set_zero(w.T[k].v, 1);
    for (int s = 0; s < n; ++s) {
        mpfr_set_d(w.a.v, x[s], MPFR_RNDN);
        mpfr_set_d(w.b.v, y[s], MPFR_RNDN);
        for (int k = 1; k <= 2 * theOrder; ++k) {
            mpfr_add(w.S[k].v, w.S[k].v, w.a.v, MPFR_RNDN);
            mpfr_mul_d(w.a.v, w.a.v, x[s], MPFR_RNDN);
        }
        for (int k = 1; k <= np; ++k) {
            mpfr_add(w.T[k].v, w.T[k].v, w.b.v, MPFR_RNDN);
            mpfr_mul_d(w.b.v, w.b.v, x[s], MPFR_RNDN);
        }
    }
    for (int i = 1; i <= np; ++i)
        for (int j = 1; j <= np; ++j) mpfr_set(w.M[i][j].v, w.S[i + j - 2].v, MPFR_RNDN);
    mpfr_set_si(w.M[1][1].v, n, MPFR_RNDN);

    const int aResult = eliminate(w, np);
    if (aResult != CQORV_POLY_DONE) return aResult;

    // Coefficient j is X[j + 1].
    for (int j = 0; j < np; ++j) {
        if (theCoef) theCoef[j] = toDouble(w.X[j + 1].v);
        if (theCoefMp) mpfr_set(theCoefMp[j], w.X[j + 1].v, MPFR_RNDN);
    }
    if (theCheckN > 0) {
        mpfr_t aCoef[CQORV_POLY_ROWS];
        for (int j = 0; j < np; ++j) aCoef[j][0] = w.X[j + 1].v[0];  // a view, not a copy
        for (int s = 0; s < theCheckN; ++s) {
            evaluateMp(aCoef, np, theCheckX[s], w.a.v, w.b.v, w.tmp.v);
            mpfr_sub_d(w.a.v, w.a.v, theCheckY[s], MPFR_RNDN);
            fdfTrace("   Error : %.10e\n", toDouble(w.a.v));
        }
    }
    return CQORV_POLY_DONE;
}

PolynomialFit::PolynomialFit()
{
    for (mpfr_ptr v : {mX, mPower, mSum, mTmp1, mTmp2}) mpfr_init2(v, CQORV_POLY_BITS);
}

PolynomialFit::~PolynomialFit()
{
    clear();
    for (mpfr_ptr v : {mX, mPower, mSum, mTmp1, mTmp2}) mpfr_clear(v);
}

PolynomialFit::PolynomialFit(const PolynomialFit& theOther) : PolynomialFit()
{
    *this = theOther;
}

PolynomialFit& PolynomialFit::operator=(const PolynomialFit& theOther)
{
    if (this == &theOther) return *this;
    clear();
    allocate(theOther.mCount);
    for (int j = 0; j < mCount; ++j) mpfr_set(mCoef[j], theOther.mCoef[j], MPFR_RNDN);
    mOutsideValue = theOther.mOutsideValue;
    mTableCount = theOther.mTableCount;
    mTableStart = theOther.mTableStart;
    mTableStep = theOther.mTableStep;
    mTableFactor = theOther.mTableFactor;
    mTable = theOther.mTable;
    mSamples = theOther.mSamples;
    return *this;
}

void PolynomialFit::clear()
{
    for (int j = 0; j < mCount; ++j) mpfr_clear(mCoef[j]);
    mCoef.reset();
    mCount = 0;
    mTableCount = 0;
    mTable.clear();
    mSamples.clear();
    mDoubleCoef.clear();
    mDoubleCoefMade = false;
}

void PolynomialFit::allocate(int theCount)
{
    mCount = theCount;
    if (theCount <= 0) return;
    mCoef = std::make_unique<mpfr_t[]>(theCount);
    for (int j = 0; j < theCount; ++j) mpfr_init2(mCoef[j], CQORV_POLY_BITS);
}

bool PolynomialFit::Fit(int theOrder, int theCount, const double* x, const double* y, double theOutsideValue)
{
    clear();
    mOutsideValue = theOutsideValue;
    int aResult = CQORV_POLY_ORDER_RANGE;
    // Order 0 never reaches the solver, where order 0 with no samples means "release".
    if (theOrder >= 1 && theOrder <= CQORV_POLY_MAX_ORDER) {
        allocate(theOrder + 1);
        // The last sample stays out of the fit.
        aResult = fqorvPolySolve(theOrder, theCount - 1, x, y, nullptr, mCoef.get());
        fqorvPolySolve(0, 0, nullptr, nullptr);
    }
    if (aResult == CQORV_POLY_DONE) return true;
    clear();
    const char* aText = aResult == CQORV_POLY_SINGULAR     ? "Coef matrix is singular \n"
                        : aResult == CQORV_POLY_ORDER_RANGE ? " Order out of range (1-48)\n"
                                                            : " # data samples < 2 \n";
    QORV_WARNING(CQORV_ERR_MANDATORY, aText);
    return false;
}

double PolynomialFit::Evaluate(double x)
{
    if (mTableCount > 0) {
        const double u = (x - mTableStart) / mTableStep;
        const int i = static_cast<int>(u);
        if (i < 0 || i > mTableCount - 1) return mOutsideValue;
        const double f = (u - i) * mTableFactor;
        // The last entry has no upper neighbour: it stands for itself.
        const double aUpper = i + 1 < mTableCount ? mTable[i + 1] : mTable[i];
        return f * aUpper + (1.0 - f) * mTable[i];
    }
    if (!mSamples.empty()) {
        if (x < mSamples.front().mX || x > mSamples.back().mX) return mOutsideValue;
        // Upper neighbour: the first sample not below x; lower: the one before (or itself at the start).
        const auto aUp = std::lower_bound(mSamples.begin(), mSamples.end(), x,
                                          [](const CPolySample& s, double v) { return s.mX < v; });
        const auto aLow = aUp == mSamples.begin() ? aUp : aUp - 1;
        const double d1 = x - aLow->mX, d2 = aUp->mX - x;
        if (d1 + d2 == 0.0) return aLow->mY;
        return (d2 / (d1 + d2)) * aLow->mY + (d1 / (d1 + d2)) * aUp->mY;
    }
    evaluateMp(mCoef.get(), mCount, x, mSum, mPower, mTmp1);
    return toDouble(mSum);
}

double PolynomialFit::FastEvaluate(double x)
{
    if (!mDoubleCoefMade) {
        mDoubleCoef = Coefficients();
        mDoubleCoefMade = true;
    }
    if (static_cast<int>(mDoubleCoef.size()) != mCount) QORV_FATAL(CQORV_ERR_POLYNOMIAL_ORDER, "FastEvaluate");
    // The fixed behaviour of the imprecise form: the sum of the coefficients, x does not enter.
    double aSum = 0.0;
    for (double c : mDoubleCoef) aSum += c;
    return aSum;
}

std::vector<double> PolynomialFit::Coefficients() const
{
    std::vector<double> aCoef(mCount);
    for (int j = 0; j < mCount; ++j) aCoef[j] = toDouble(mCoef[j]);
    return aCoef;
}

void PolynomialFit::SetCoefficients(const std::vector<double>& theCoef)
{
    for (int j = 0; j < mCount; ++j) mpfr_clear(mCoef[j]);
    mCoef.reset();
    allocate(static_cast<int>(theCoef.size()));
    for (int j = 0; j < mCount; ++j) mpfr_set_d(mCoef[j], theCoef[j], MPFR_RNDN);
    mDoubleCoef.clear();
    mDoubleCoefMade = false;
}

void PolynomialFit::SetTable(double theStart, double theStep, double theFactor, const std::vector<double>& theValues)
{
    mTableStart = theStart;
    mTableStep = theStep;
    mTableFactor = theFactor;
    mTable = theValues;
    mTableCount = static_cast<int>(theValues.size());
}

void PolynomialFit::SetSampleList(const std::vector<CPolySample>& theSamples)
{
    mSamples = theSamples;
}

CPolyErrorStats PolynomialFit::ErrorReport(int n, const double* x, const double* y, bool thePrecise, bool thePerSample)
{
    CPolyErrorStats aStats;
    fdfTrace(" ERROR POLYNOMIAL - START  %d\n", mCount - 1);
    double aSum = 0.0, aSumPos = 0.0, aSumNeg = 0.0;
    int aPos = 0, aNeg = 0;
    for (int s = 0; s < n; ++s) {
        const double aValue = thePrecise ? Evaluate(x[s]) : FastEvaluate(x[s]);
        const double d = aValue - y[s];
        if (thePerSample) fdfTrace("%d -> %.10e  %.10e\n", s, aValue, d);
        aStats.mMax = s == 0 ? d : std::max(aStats.mMax, d);
        aStats.mMin = s == 0 ? d : std::min(aStats.mMin, d);
        aSum += d;
        if (d > 0.0) {
            aSumPos += d;
            ++aPos;
        } else if (d < 0.0) {
            aSumNeg += d;
            ++aNeg;
        }
    }
    if (n > 0) aStats.mMean = aSum / n;
    if (aPos > 0) aStats.mMeanPositive = aSumPos / aPos;
    if (aNeg > 0) aStats.mMeanNegative = aSumNeg / aNeg;
    fdfTrace(" Max  : %.10e\n Min  : %.10e\nMean  : %.10e  positive %.10e  negative %.10e\n", aStats.mMax, aStats.mMin,
             aStats.mMean, aStats.mMeanPositive, aStats.mMeanNegative);
    return aStats;
}

std::vector<double> fqorvPolyFit(const double* x, const double* y, int theDegree, int n)
{
    const int np = theDegree + 1;
    // Power sums: sum x^k for k = 0 .. 2 degree, and sum y x^k for k = 0 .. degree.
    std::vector<double> aPowerSum(2 * theDegree + 1, 0.0), aRight(np, 0.0);
    for (int s = 0; s < n; ++s) {
        double p = 1.0;
        for (int k = 0; k <= 2 * theDegree; ++k) {
            aPowerSum[k] += p;
            if (k < np) aRight[k] += y[s] * p;
            p *= x[s];
        }
    }
    CSmallMatrix aNormal(np);
    for (int i = 0; i < np; ++i)
        for (int j = 0; j < np; ++j) aNormal(i, j) = aPowerSum[i + j];
    return aNormal.inverse() * aRight;
}
