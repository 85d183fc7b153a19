// The transform wrapper: complex single-precision FFTs, in place, unscaled in both directions.
//
// A plan is made once per size and direction and executed many times. Forward followed by
// inverse multiplies the data by the transform size; nothing divides it out, so a step that needs
// a scaled result scales explicitly. A plan that cannot be made is failure 522240.
#pragma once

#include <cstddef>

#include "qorv_complex.h"

enum class FftDirection { Forward, Inverse };

/// Sets the number of threads FFTW may use for plans made afterwards with threading asked for.
/// Called once at start-up; per-line 1-D plans never use threads.
void fqorvFftSetThreads(int theThreads);

/// A 1-D transform of n points on fcomplex data, in place.
class FftPlan1D {
public:
    FftPlan1D(int theSize, FftDirection theDirection);
    ~FftPlan1D();
    FftPlan1D(const FftPlan1D&) = delete;
    FftPlan1D& operator=(const FftPlan1D&) = delete;
    FftPlan1D(FftPlan1D&& theOther) noexcept;

    /// Transforms theData[0 .. size-1] in place. Any alignment is accepted.
    void execute(fcomplex* theData) const;
    int size() const { return mSize; }

private:
    int mSize;
    FftDirection mDirection;
    void* mPlanAligned = nullptr;    // fftwf_plan for 16-byte aligned data
    void* mPlanUnaligned = nullptr;  // fftwf_plan for any alignment
};

/// A 2-D transform of rows x cols points (row-major, contiguous), in place. May use threads.
class FftPlan2D {
public:
    FftPlan2D(int theRows, int theCols, FftDirection theDirection, bool theThreaded = true);
    ~FftPlan2D();
    FftPlan2D(const FftPlan2D&) = delete;
    FftPlan2D& operator=(const FftPlan2D&) = delete;

    void execute(fcomplex* theData) const;
    int rows() const { return mRows; }
    int cols() const { return mCols; }

private:
    int mRows;
    int mCols;
    FftDirection mDirection;
    void* mPlan = nullptr;
};

/// Many 1-D transforms down the columns of a row-major block (rows points each, cols columns).
class FftPlanColumns {
public:
    FftPlanColumns(int theRows, int theCols, FftDirection theDirection, bool theThreaded = true);
    ~FftPlanColumns();
    FftPlanColumns(const FftPlanColumns&) = delete;
    FftPlanColumns& operator=(const FftPlanColumns&) = delete;

    void execute(fcomplex* theData) const;

private:
    int mRows;
    int mCols;
    FftDirection mDirection;
    void* mPlan = nullptr;
};

/// Buffer of fcomplex aligned for SIMD transforms.
class FftBuffer {
public:
    explicit FftBuffer(std::size_t theSize = 0);
    ~FftBuffer();
    FftBuffer(const FftBuffer&) = delete;
    FftBuffer& operator=(const FftBuffer&) = delete;
    FftBuffer(FftBuffer&& theOther) noexcept;
    FftBuffer& operator=(FftBuffer&& theOther) noexcept;
    fcomplex* data() { return mData; }
    const fcomplex* data() const { return mData; }
    fcomplex& operator[](std::size_t i) { return mData[i]; }
    const fcomplex& operator[](std::size_t i) const { return mData[i]; }
    std::size_t size() const { return mSize; }
    void clear();

private:
    fcomplex* mData = nullptr;
    std::size_t mSize = 0;
};
