// Raw sample formats and line prefixes of the simulated sensors.
//
// Byte samples (ERS, ALOS), 5-bit by default: each component x becomes the code
// q = floor(g x) + 2^(b-1) clipped to 0 .. 2^b - 1, which stands for (q - 2^(b-1) + 0.5) / g: a
// mid-rise quantiser without bias, 15.5 (5 bits) or 127.5 (8 bits) being the offset that the
// chain's I/Q offset estimate removes.
// Block-adaptive 4-bit samples (ENVISAT, decoded): every block of 64 complex samples is scaled by
// its own rms, each component quantised to the 16 Lloyd-Max levels of a unit Gaussian, and
// written back as float level * rms ("FLOAT_COMPLEX", no offset).
#pragma once

#include <complex>
#include <cstdint>

#include "qorv_sim_scene.h"

/// Quantises n complex samples to theBits-bit codes (5 to 8; I then Q per sample, 2 n bytes) with
/// theGain codes per unit; returns the number of components that were clipped.
long fqorvSimQuantiseBytes(const std::complex<double>* theIn, int n, double theGain, int theBits, uint8_t* theOut);
inline long fqorvSimQuantise5Bit(const std::complex<double>* theIn, int n, double theGain, uint8_t* theOut)
{
    return fqorvSimQuantiseBytes(theIn, n, theGain, 5, theOut);
}
/// The value (in units of the input) that a 5-bit code stands for.
inline double fqorvSimDecode5Bit(uint8_t theCode, double theGain) { return (theCode - 15.5) / theGain; }

/// Block size of the block-adaptive quantiser, complex samples.
inline constexpr int CQORV_SIM_BAQ_BLOCK = 64;
/// Quantises n complex samples block-adaptively to 4 bits and writes the decoded values (2 n
/// floats, I then Q); returns the number of components beyond the outermost decision level.
long fqorvSimQuantiseBaq4Bit(const std::complex<double>* theIn, int n, float* theOut);

/// What a record's prefix carries.
struct CSimPrefixValues {
    uint32_t mCounter = 0;
    int mSwstCode = 0;
    int mPriCode = 0;
    int32_t mSlantRange = 0;  // m, slant range of the first sample (ALOS)
};

/// Writes the fields of a prefix at their positions, big-endian, over theOut (mSize bytes); the
/// other bytes are seeded random, different for every record (theRecord) so that nothing can
/// rely on them.
void fqorvSimEncodePrefix(const CSimPrefixLayout& theLayout, const CSimPrefixValues& theValues, uint64_t theSeed,
                          uint64_t theRecord, uint8_t* theOut);
/// Big-endian writers and readers.
void fqorvSimPutBE16(uint8_t* theOut, uint16_t theValue);
void fqorvSimPutBE32(uint8_t* theOut, uint32_t theValue);
uint16_t fqorvSimGetBE16(const uint8_t* theIn);
uint32_t fqorvSimGetBE32(const uint8_t* theIn);
