// The complex sample types that every layer uses: single precision for the processing buffers,
// double precision for bookkeeping and estimators.
#pragma once

#include <complex>

using fcomplex = std::complex<float>;
using dcomplex = std::complex<double>;
