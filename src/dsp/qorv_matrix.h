// Matrices of rows of T in one contiguous allocation, with a table of row pointers.
//
// A two-dimensional transform works on the block through the first row's pointer.
#pragma once

#include <sys/mman.h>

#include <cstddef>
#include <cstdlib>
#include <new>
#include <vector>

/// Storage of large matrices: 64-byte aligned (the transforms' vector loads), and from 2 MB on
/// aligned to 2 MB and offered huge pages, so that the first touch of a block of several hundred
/// megabytes faults once per 2 MB rather than once per 4 kB and the column passes of the
/// transforms miss the TLB less. The contents are the same either way.
template <typename T>
struct CQorvMatrixAllocator {
    using value_type = T;
    CQorvMatrixAllocator() = default;
    template <typename U>
    CQorvMatrixAllocator(const CQorvMatrixAllocator<U>&) noexcept {}
    T* allocate(std::size_t n)
    {
        constexpr std::size_t aHuge = std::size_t{2} << 20;
        const std::size_t aBytes = n * sizeof(T);
        const std::size_t aAlign = aBytes >= aHuge ? aHuge : 64;
        void* p = std::aligned_alloc(aAlign, (aBytes + aAlign - 1) / aAlign * aAlign);
        if (!p) throw std::bad_alloc();
        if (aAlign == aHuge) madvise(p, aBytes, MADV_HUGEPAGE);
        return static_cast<T*>(p);
    }
    void deallocate(T* p, std::size_t) noexcept { std::free(p); }
    template <typename U>
    bool operator==(const CQorvMatrixAllocator<U>&) const noexcept { return true; }
};

template <typename T>
class CQorvMatrix {
public:
    CQorvMatrix() = default;
    CQorvMatrix(std::size_t theRows, std::size_t theCols) { resize(theRows, theCols); }

    /// Reallocates zeroed storage and rebuilds the row table.
    void resize(std::size_t theRows, std::size_t theCols)
    {
        mRows = theRows;
        mCols = theCols;
        mData.assign(theRows * theCols, T{});
        mRowTable.resize(theRows);
        for (std::size_t r = 0; r < theRows; ++r) mRowTable[r] = mData.data() + r * theCols;
    }
    T* operator[](std::size_t r) { return mRowTable[r]; }
    const T* operator[](std::size_t r) const { return mRowTable[r]; }
    /// The row table, for code that rotates rows without moving data.
    T** rows() { return mRowTable.data(); }
    T* data() { return mData.data(); }
    const T* data() const { return mData.data(); }
    std::size_t nRows() const { return mRows; }
    std::size_t nCols() const { return mCols; }

private:
    std::size_t mRows = 0;
    std::size_t mCols = 0;
    std::vector<T, CQorvMatrixAllocator<T>> mData;
    std::vector<T*> mRowTable;
};

/// The allocation helper of the steps: rows x cols of T, zeroed.
template <typename T>
CQorvMatrix<T> fdfNewMatrix(std::size_t theRows, std::size_t theCols)
{
    return CQorvMatrix<T>(theRows, theCols);
}
