// The writer of raw products: the lines of a planned product, copied from the archive's records
// with their prefixes rebuilt to the layout the chain reads, and the header that describes them.
// Every prefix field is big-endian:
//   ERS   "UBYTE_COMPLEX", a 412-byte prefix: line counter u32 at 210, SWST code u16 at 214, PRI
//         code u16 at 60; the I,Q bytes as the archive holds them.
//   ASAR  "FLOAT_COMPLEX" (big-endian floats), a 64-byte prefix: line counter u32 at 54, SWST u16
//         at 58 and PRI u16 at 60, both in samples; the FBAQ codes decoded by the instrument
//         file's tables; a line as wide as the longest packet, shorter packets padded with 0.
//   ALOS  "UBYTE_COMPLEX", the record's own 412-byte prefix: line counter u32 at 12, slant range
//         s32 at 116 (m), and at 60 an ERS PRI code of the product's PRF (the chain scans byte 60
//         of every raw product but ENVISAT's as one); the I,Q bytes as the archive holds them,
//         the right-fill behind them left out.
//
// A product R is written as R.part and renamed to R when its last line is in; its header R.sml
// comes last. A product whose header exists is complete; an import that fails leaves no R.sml
// (and no R of its own).
#pragma once

#include <filesystem>
#include <functional>
#include <string>

#include "qorv_line_plan.h"
#include "qorv_native_archive.h"
#include "qorv_native_reader.h"
#include "qorv_product_description.h"

/// Bytes before each line's samples in a written ERS raw product, and the fields the chain reads.
inline constexpr int CQORV_ERS_ROW_PREFIX = 412;
inline constexpr int CQORV_ERS_COUNTER_POS = 210;
inline constexpr int CQORV_ERS_SWST_POS = 214;
inline constexpr int CQORV_ERS_PRI_POS = 60;
/// Where the archive's auxiliary block goes in the written prefix (as in the CEOS products whose
/// counter stands at 210).
inline constexpr int CQORV_ERS_AUX_POS = 192;
inline constexpr int CQORV_ERS_AUX_BYTES = 26;
/// The same for an ASAR raw product ...
inline constexpr int CQORV_ASAR_ROW_PREFIX = 64;
inline constexpr int CQORV_ASAR_COUNTER_POS = 54;
inline constexpr int CQORV_ASAR_SWST_POS = 58;
/// ... and for an ALOS one (the PRI code stands at CQORV_ERS_PRI_POS in all three).
inline constexpr int CQORV_ALOS_ROW_PREFIX = 412;
inline constexpr int CQORV_ALOS_COUNTER_POS = 12;
inline constexpr int CQORV_ALOS_RANGE_POS = 116;

/// Writes the raster theRoot (through theRoot.part) of theProduct's lines from theRecords, then its
/// header theRoot.sml. theProgress, when given, receives the percentage of lines written.
/// CImportFailure 261123 when theRoot.part cannot be created, 261124 when a write fails (the disk
/// is full), 261125 when a record cannot be read; what was begun is removed first.
void fqorvWriteRawProduct(const CNativeArchive& theArchive, CNativeRecordFile& theRecords,
                          const CPlannedProduct& theProduct, const CProductDescription& theDescription,
                          const std::filesystem::path& theRoot, const std::function<void(int)>& theProgress = {});

/// Fills theHeader (a full 21-section header) for a product: every field the chain reads from a
/// raw product of the archive's sensor. Separate from the writer so that the header can be checked on its own.
class CDescriptionHeader;
void fqorvFillRawHeader(CDescriptionHeader& theHeader, const CNativeArchive& theArchive,
                        const CPlannedProduct& theProduct, const CProductDescription& theDescription);
