// The pool of line buffers used by the header and key-file readers.
//
// Header and key files can hold very long lines, so readers take a buffer of one megabyte from a
// global table of 110 rows. A buffer is allocated when its row is first taken and kept for the rest
// of the process.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

inline constexpr int CQORV_POOL_NBR = 110;
inline constexpr std::size_t CQORV_POOL_BUFFER_SIZE = 1000000;

/// The pool of one-megabyte line buffers used by the readers.
class CLineBufferPool {
public:
    /// Takes the first free buffer (allocated on first use); "All pools are busy" is 848646.
    int take();
    char* buffer(int theIndex);
    std::size_t size(int theIndex) const;
    void release(int theIndex);
    /// Builds the table (fdfInit does it with 110 rows).
    void build(int theRows);
    int rows() const { return static_cast<int>(mRows.size()); }

private:
    struct Row {
        bool mBusy = false;
        std::size_t mSize = 0;
        std::unique_ptr<char[]> mAddress;
    };
    std::vector<Row> mRows;
};
extern CLineBufferPool gLineBufferPool;

/// Holds a pool buffer for a scope.
class CPoolBufferLease {
public:
    CPoolBufferLease() : mIndex(gLineBufferPool.take()) {}
    ~CPoolBufferLease() { gLineBufferPool.release(mIndex); }
    CPoolBufferLease(const CPoolBufferLease&) = delete;
    CPoolBufferLease& operator=(const CPoolBufferLease&) = delete;
    char* data() { return gLineBufferPool.buffer(mIndex); }
    std::size_t size() const { return gLineBufferPool.size(mIndex); }

private:
    int mIndex;
};
