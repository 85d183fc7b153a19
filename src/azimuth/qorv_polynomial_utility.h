// Least-squares polynomial fits in arbitrary precision, and their evaluation.
//
// Fits of high order on large abscissae (slant ranges in metres, row numbers) are ill-conditioned
// in double precision, so the normal equations are formed and solved with MPFR numbers of
// CQORV_POLY_BITS bits (80 significant decimal digits); only the final coefficients come back as
// doubles, through a text of 25 significant digits.
#pragma once

#include <mpfr.h>

#include <memory>
#include <vector>

/// Working precision of the fits: 266 bits hold 80 significant decimal digits.
inline constexpr mpfr_prec_t CQORV_POLY_BITS = 266;
/// Highest order the solver accepts.
inline constexpr int CQORV_POLY_MAX_ORDER = 48;

/// Solver results.
inline constexpr int CQORV_POLY_DONE = 0;
inline constexpr int CQORV_POLY_SINGULAR = 1;
inline constexpr int CQORV_POLY_ORDER_RANGE = 2;
inline constexpr int CQORV_POLY_FEW_SAMPLES = 3;

/// Least-squares polynomial of theOrder through n samples (x, y), Gaussian elimination with partial
/// pivoting at 80 digits, pivot limit 1.0E-40. Coefficients c0 first into theCoef (doubles, may be
/// null) and theCoefMp (theOrder + 1 initialised MPFR values, may be null). Each check sample
/// (theCheckN of them) traces "   Error : " and its residual. Result: 0 done, 1 singular matrix,
/// 2 order outside 1..48, 3 fewer than 2 samples. Order 0 with n 0 releases the work area and gives 0.
/// The work area is one per thread: calls on one thread do not overlap.
int fqorvPolySolve(int theOrder, int n, const double* x, const double* y, double* theCoef = nullptr,
                   mpfr_t* theCoefMp = nullptr, int theCheckN = 0, const double* theCheckX = nullptr,
                   const double* theCheckY = nullptr);

/// A sample of a curve kept as a sorted list.
struct CPolySample {
    double mX;
    double mY;
};

/// Statistics of an error report: differences fitted value - sample value.
struct CPolyErrorStats {
    double mMax = 0.0;
    double mMin = 0.0;
    double mMean = 0.0;
    double mMeanPositive = 0.0;
    double mMeanNegative = 0.0;
};

/// One fitted curve: a polynomial in arbitrary precision, or a uniform table, or a sorted sample
/// list, evaluated in that order of precedence.
class PolynomialFit {
public:
    PolynomialFit();
    ~PolynomialFit();
    PolynomialFit(const PolynomialFit& theOther);
    PolynomialFit& operator=(const PolynomialFit& theOther);

    /// Fits theOrder to the first theCount - 1 of the samples (the last one stays unused). On a
    /// failure it warns with id 848641, leaves the object empty and returns false.
    bool Fit(int theOrder, int theCount, const double* x, const double* y, double theOutsideValue);

    /// The curve at x: table, else sample list, else the polynomial at 80 digits.
    double Evaluate(double x);
    /// The sum of the double coefficients; x does not enter it. Failure 456965 when the double
    /// coefficients' count disagrees with the polynomial's.
    double FastEvaluate(double x);
    /// The coefficients as doubles, c0 first; empty for an empty object.
    std::vector<double> Coefficients() const;
    /// Replaces the polynomial by the given coefficients (c0 first) as exact doubles.
    void SetCoefficients(const std::vector<double>& theCoef);

    /// A uniform table: value i at theStart + i theStep; between neighbours the weight of the upper
    /// one is the fractional index times theFactor. Outside the table, the outside value.
    void SetTable(double theStart, double theStep, double theFactor, const std::vector<double>& theValues);
    /// A sample list sorted by x; evaluated by linear interpolation between neighbours.
    void SetSampleList(const std::vector<CPolySample>& theSamples);
    void SetOutsideValue(double theValue) { mOutsideValue = theValue; }

    /// Traces the fit's differences at n samples (one line per sample when thePerSample) and
    /// returns their statistics; thePrecise chooses Evaluate, otherwise FastEvaluate.
    CPolyErrorStats ErrorReport(int n, const double* x, const double* y, bool thePrecise, bool thePerSample);

    /// Order + 1; 0 for an empty object.
    int CoefficientCount() const { return mCount; }

private:
    void clear();
    void allocate(int theCount);

    std::unique_ptr<mpfr_t[]> mCoef;  // c0 .. c_order, each initialised at CQORV_POLY_BITS
    int mCount = 0;
    mpfr_t mX, mPower, mSum, mTmp1, mTmp2;  // working values, allocated once per object
    double mOutsideValue = 0.0;
    int mTableCount = 0;
    double mTableStart = 0.0, mTableStep = 1.0, mTableFactor = 1.0;
    std::vector<double> mTable;
    std::vector<CPolySample> mSamples;
    std::vector<double> mDoubleCoef;  // filled on first need
    bool mDoubleCoefMade = false;
};

/// Double-precision least-squares polynomial of theDegree through n samples: normal equations of
/// power sums solved by the inverse of their matrix. Coefficients c0 first, theDegree + 1 of them.
/// Throws DSPMathException("Invert of singular matrix") when the system is singular.
std::vector<double> fqorvPolyFit(const double* x, const double* y, int theDegree, int n);
