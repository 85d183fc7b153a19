#include "qorv_fbaq.h"

#include <algorithm>

namespace {

/// The table row of a 4-bit code: codes 8 .. 15 are the negative levels from the smallest out
/// (rows 7 .. 0), codes 0 .. 7 the positive ones (rows 8 .. 15).
constexpr int fRow(int theCode) { return theCode >= 8 ? 15 - theCode : 8 + theCode; }

}  // namespace

std::size_t fqorvFbaqSamples(std::size_t theBytes)
{
    const std::size_t aLast = theBytes % CQORV_FBAQ_BLOCK_BYTES;
    return theBytes / CQORV_FBAQ_BLOCK_BYTES * CQORV_FBAQ_BLOCK_SAMPLES + (aLast > 0 ? aLast - 1 : 0);
}

void fqorvDecodeFbaq4(const uint8_t* theBlocks, std::size_t theBytes, const CFbaqTables& theTables, float* theOut)
{
    const float* aI = theTables.mI.data();
    const float* aQ = theTables.mQ.data();
    for (std::size_t aBlock = 0; aBlock < theBytes; aBlock += CQORV_FBAQ_BLOCK_BYTES) {
        const std::size_t n = std::min<std::size_t>(CQORV_FBAQ_BLOCK_BYTES, theBytes - aBlock);
        const int aId = theBlocks[aBlock];
        // The 16 values of each component in this block, looked up once.
        float aLevelI[16], aLevelQ[16];
        for (int v = 0; v < 16; ++v) {
            aLevelI[v] = aI[256 * fRow(v) + aId];
            aLevelQ[v] = aQ[256 * fRow(v) + aId];
        }
        for (std::size_t k = 1; k < n; ++k) {
            const uint8_t b = theBlocks[aBlock + k];
            *theOut++ = aLevelI[b >> 4];
            *theOut++ = aLevelQ[b & 0x0F];
        }
    }
}
