// Step 2 of the chain, "range compression": raw complex echoes to a FLOAT_COMPLEX range
// compressed raster with its header, with I/Q offset removal, the optional azimuth prefilter and
// decimation, and the echo line continuity checks.
#pragma once

/// argv: title, signal_data, rc_data, proc_par [prefilter] [offset] [nl] [aRgFFTSize]. Returns 0.
int qorv_pre_rc(int argc, char** argv);
