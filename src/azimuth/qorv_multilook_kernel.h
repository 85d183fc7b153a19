// Detection and averaging of look rectangles: the arithmetic of the multi-look steps, apart from
// files and headers. Power means re^2 + im^2 of a complex sample, or the value of a real one.
#pragma once

#include <vector>

#include "qorv_complex.h"

/// Mean power of rectangles of theRangeLooks columns by however many lines are added: output pixel
/// x takes input columns x*rl .. x*rl+rl-1 (columns beyond (W/rl)*rl are ignored). Samples equal to
/// the input null value (null comparison) are left out; a rectangle with none left gives the
/// output null value. Sums are kept in double precision.
class CMultiLookAverager {
public:
    /// theInputWidth pixels per input line and theRangeLooks, both at least 1 (checked by the caller).
    CMultiLookAverager(int theInputWidth, int theRangeLooks, double theInputNull, float theOutputNull);

    /// Output pixels per line: W / rl.
    int outputWidth() const { return mOutputWidth; }
    /// Adds one input line of W power values.
    void addLine(const double* thePower);
    /// Writes the mean of every rectangle into theOut (outputWidth() values) and starts anew.
    void takeLine(float* theOut);

private:
    int mInputWidth;
    int mRangeLooks;
    int mOutputWidth;
    double mInputNull;
    float mOutputNull;
    std::vector<double> mSum;
    std::vector<int> mCount;
};

/// One output line of the subaperture multi-look, for subaperture theSubaperture of
/// theSubapertures. theRows holds theAzimuthLooks input lines of theWidth samples. Output pixel p
/// is centred on column x = rl/2 + p*rl and exists while x < W - rl/2; it sums the power of the
/// theAzimuthLooks rows and columns x - rl/2 .. x - rl/2 + rl - 1, in single precision, and
/// divides by al * rl * nsub. Subaperture 0 stores that value; a later one adds it, except that a
/// sum of 0.0 or a stored 0.0 (the null value) makes the pixel 0.0. Pixels without a rectangle
/// are left as they are (the caller clears the line before subaperture 0).
void fqorvSubapertureLookLine(const fcomplex* theRows, int theAzimuthLooks, int theWidth, int theRangeLooks,
                              int theSubaperture, int theSubapertures, float* theMliLine);
