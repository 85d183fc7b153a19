#include "qorv_line_pool.h"

#include "qorv_enviroment.h"
#include "qorv_errors.h"

CLineBufferPool gLineBufferPool;

void CLineBufferPool::build(int theRows)
{
    mRows.clear();
    mRows.resize(static_cast<std::size_t>(theRows > 0 ? theRows : 0));
}

int CLineBufferPool::take()
{
    if (mRows.empty()) build(CQORV_POOL_NBR);
    for (std::size_t i = 0; i < mRows.size(); ++i) {
        Row& aRow = mRows[i];
        if (aRow.mBusy) continue;
        if (!aRow.mAddress) {
            aRow.mAddress = std::make_unique<char[]>(CQORV_POOL_BUFFER_SIZE);
            aRow.mSize = CQORV_POOL_BUFFER_SIZE;
        }
        aRow.mBusy = true;
        return static_cast<int>(i);
    }
    fdfTrace("ECEEDED : %d", static_cast<int>(mRows.size()));
    QORV_FATAL(CQORV_ERR_INDEX_RANGE, "All pools are busy");
}

char* CLineBufferPool::buffer(int theIndex) { return mRows[static_cast<std::size_t>(theIndex)].mAddress.get(); }

std::size_t CLineBufferPool::size(int theIndex) const { return mRows[static_cast<std::size_t>(theIndex)].mSize; }

void CLineBufferPool::release(int theIndex)
{
    if (theIndex >= 0 && static_cast<std::size_t>(theIndex) < mRows.size()) mRows[static_cast<std::size_t>(theIndex)].mBusy = false;
}
