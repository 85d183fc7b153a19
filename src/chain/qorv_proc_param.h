// Step 0 of the chain, "Processing parameters construction": makes the processing parameter file
// (a header of the one section "sar_processing") from the defaults file and the raw data's header.
#pragma once

/// Step entry: argv[1] the processing parameter file to write, argv[2] the raw data file whose
/// header ("<raw>_hdr" or "<raw>.sml") is read, argv[3] named in the usage text only.
/// Returns 0; fewer than three arguments are failure 456962, a missing raw header 261122, a
/// parameter file that can't be written 261123.
int qorv_proc_param(int argc, char** argv);

/// Name of the defaults file in the QORVEX_CEOS_DES_FILES_DIR directory.
inline constexpr const char* CQORV_PROC_PARAM_DEFAULTS_FILE = "sar_processing_default_par";
