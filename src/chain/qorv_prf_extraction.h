// PRF change extraction: records the changes of the pulse repetition frequency of a raw product
// in its header before the first step.
#pragma once

/// Scans the line prefixes of theInput's raster for PRI codes and writes "ChannelInfo.PRFChanges"
/// (and "ChannelInfo.PRF"[0]) into theInput + "_hdr", keeping the original header once as
/// theInput + "_old_hdr". ENVISAT-1 inputs are left untouched.
void fdfExtractPrfChanges(const char* theInput);
