// ENVISAT ASAR's flexible block adaptive quantisation (FBAQ 8:4): the sample data of an echo
// packet are blocks of 64 bytes, a block id followed by 63 samples of one byte each, the I code in
// the high and the Q code in the low four bits (the last block may be shorter). The instrument
// file's tables give the value of a code in a block: CFbaqTables (qorv_native_archive.h).
#pragma once

#include <cstddef>
#include <cstdint>

#include "qorv_native_archive.h"

/// Bytes of one FBAQ block, and the samples it holds.
inline constexpr int CQORV_FBAQ_BLOCK_BYTES = 64;
inline constexpr int CQORV_FBAQ_BLOCK_SAMPLES = 63;

/// The complex samples that theBytes of blocks hold: 63 a whole block, one less than its bytes a
/// last shorter block.
std::size_t fqorvFbaqSamples(std::size_t theBytes);

/// Decodes theBytes of FBAQ blocks into fqorvFbaqSamples(theBytes) complex values, I and Q floats
/// in turn, at theOut. The tables hold 4096 values each.
void fqorvDecodeFbaq4(const uint8_t* theBlocks, std::size_t theBytes, const CFbaqTables& theTables, float* theOut);
