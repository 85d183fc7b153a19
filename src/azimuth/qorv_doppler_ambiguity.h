// Step 4 of the chain, "doppler ambiguity": the first and the last of four azimuth looks are
// focused with the baseband Doppler centroid; a missing whole number of PRF cycles shifts them
// against each other in range, and that number is added to the Doppler table of the data's header.
#pragma once

#include <vector>

#include "qorv_complex.h"

/// argv: title, rc_data, proc_par [prefilter] [az_FFT] [az_offset]. Returns 0.
int qorv_doppler_ambiguity(int argc, char** argv);

/// Shut function: deletes the two look files of the range compressed file named by element 1.
int qorv_doppler_ambiguity_shut(int argc, char** argv);

/// The range and azimuth shift of look theSecond against look theFirst (theRows x theColumns,
/// row-major): peak of the two-dimensional cross-correlation, each shift brought into
/// (-size/2, size/2]. theFirst is overwritten.
void fqorvLookShift2D(std::vector<fcomplex>& theFirst, std::vector<fcomplex>& theSecond, int theRows, int theColumns,
                      int& theRangeShift, int& theAzimuthShift);

/// Missing ambiguity number n = 2 ka shift dr / (lambda PRF (dop2 - dop1)), not rounded.
double fqorvAmbiguityNumber(double theRangeShift, double theFmRate, double theSpacing, double theWavelength, double thePrf,
                            double theDopplerDifference);
