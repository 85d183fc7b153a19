// Step 3 of the chain, "autofocus": the first and the last of four azimuth looks of a band of the
// range compressed data are focused and detected; the azimuth shift between them turns into a new
// processing velocity in the processing parameter file.
#pragma once

#include <vector>

#include "qorv_complex.h"

/// argv: title, rc_data, proc_par [prefilter] [az_FFT] [az_offset] [display]. Returns 0.
int qorv_autofocus(int argc, char** argv);

/// The azimuth shift (decimated lines, interpolated by 1024) of look theSecond against look
/// theFirst, both theRows x theColumns detected images (row-major, magnitude in the real part):
/// column-wise cross-correlation, its magnitude summed over the columns, peak of the interpolated
/// profile. theFirst is overwritten.
double fqorvLookShift(std::vector<fcomplex>& theFirst, std::vector<fcomplex>& theSecond, int theRows, int theColumns);

/// The along-track velocity (m/s) from the look shift theShift (decimated lines): theV0 the
/// velocity the looks were focused with, theSpacing (m) the decimated line spacing, theRange (m)
/// the centre range, theWavelength (m), theDopplerDifference (Hz) between the looks.
double fqorvAutofocusVelocity(double theShift, double theV0, double theSpacing, double theRange, double theWavelength,
                              double theDopplerDifference);
