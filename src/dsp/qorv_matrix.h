// Matrices of rows of T in one contiguous allocation, with a table of row pointers.
//
// A two-dimensional transform works on the block through the first row's pointer.
#pragma once

#include <cstddef>
#include <vector>

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
    std::vector<T> mData;
    std::vector<T*> mRowTable;
};

/// The allocation helper of the steps: rows x cols of T, zeroed.
template <typename T>
CQorvMatrix<T> fdfNewMatrix(std::size_t theRows, std::size_t theCols)
{
    return CQorvMatrix<T>(theRows, theCols);
}
