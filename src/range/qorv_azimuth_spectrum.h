// Step 1 of the chain, "SAR IQ raw data azimuth spectrum": the Doppler centroid estimate of the raw
// echoes, left as the Doppler table of the raw data's header for every later step.
#pragma once

/// argv: title, signal_data, processing parameter file (unused), spectrum (never written), nsub
/// (unused) [azimuth polynomial degree]. Returns 0.
int qorv_azsp_IQ(int argc, char** argv);

/// Shut function: deletes the spectrum file named by element 3.
int qorv_azsp_IQ_shut(int argc, char** argv);
