// The writer of raw products: the lines of a planned product, copied from the archive's records
// with their prefixes rebuilt to the layout the chain reads (ERS: a 412-byte prefix with the line
// counter at 210, the SWST code at 214 and the PRI code at 60, big-endian), and the header that
// describes them.
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

/// Writes the raster theRoot (through theRoot.part) of theProduct's lines from theRecords, then its
/// header theRoot.sml. theProgress, when given, receives the percentage of lines written.
/// CImportFailure 261123 when theRoot.part cannot be created, 261124 when a write fails (the disk
/// is full), 261125 when a record cannot be read; what was begun is removed first.
void fqorvWriteRawProduct(const CNativeArchive& theArchive, CNativeRecordFile& theRecords,
                          const CPlannedProduct& theProduct, const CProductDescription& theDescription,
                          const std::filesystem::path& theRoot, const std::function<void(int)>& theProgress = {});

/// Fills theHeader (a full 21-section header) for a product: every field the chain reads from a
/// raw ERS product. Separate from the writer so that the header can be checked on its own.
class CDescriptionHeader;
void fqorvFillRawHeader(CDescriptionHeader& theHeader, const CNativeArchive& theArchive,
                        const CPlannedProduct& theProduct, const CProductDescription& theDescription);
