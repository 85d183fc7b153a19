// The two azimuth looks of autofocus and Doppler ambiguity: the first and the last of four
// subapertures of one block, filtered around their Doppler centroids, focused without azimuth
// weights and detected. What the two steps set differently (FFT size, width, line offset, geometry
// variant) comes in as values.
#pragma once

#include <string>
#include <vector>

#include "qorv_complex.h"
#include "qorv_geometry_setup.h"

class CDescriptionHeader;
class CRasterFile;

/// Number of looks the band is split into; the first and the last are focused.
inline constexpr int CQORV_LOOKS = 4;

/// Sizes and geometry of a look run.
struct CLookRun {
    std::string mInput;   // range compressed raster
    int psf = 1;
    int ndec = CQORV_LOOKS;
    int nfir = 8 * CQORV_LOOKS + 1;
    int nazft = 0;
    int w = 0;            // columns of a look: the centred part of the line
    int mWidth = 0;       // samples of an input line
    int mLines = 0;
    int mOffset = 0;      // first processed input line
    int mColumn0 = 0;     // first column of the centred part
    double fd = 0.0;      // Doppler centroid at the looks' position (Hz)
    CSpaceborneGeometry mGeometry;

    double prf() const { return mGeometry.mIn.mPrf; }
    /// Doppler centroid of look i of four around fd (Hz).
    double lookCentroid(int i) const;
    /// Rows and columns of a detected look: nazft / 2 x w.
    int lookRows() const { return nazft / 2; }
};

/// The azimuth FFT size of the look steps for theLines processed lines: the largest power of two
/// up to 4096 without "ORIGIN DATA"; for ALOS FBS up to 24,576 and for the other L-band products up
/// to 16,384 in multiples of 512; for any other product 4096 (theFixedForOthers) or the power of two.
int fqorvLookFftSize(const CDescriptionHeader& theInput, int theLines, int thePresumming, int theDecimation,
                     bool theFixedForOthers);

/// Fills sizes and geometry: theWidthLimit bounds w; the Doppler centroid is taken at the
/// variant's position through the image description of theRun.mInput.
void fqorvLookSetUp(const CDescriptionHeader& theInput, const CDescriptionHeader& thePar, const CGeometryVariant& theVariant,
                    int theWidthLimit, CLookRun& theRun);

/// Focuses looks 0 and 3 and detects rows nazft/4 .. 3 nazft/4 - 1 (magnitude in the real part)
/// into theFirst and theLast. theTitle heads each look on the trace; progress runs to 91 %.
void fqorvFocusLooks(CRasterFile& theIn, const CLookRun& theRun, const char* theTitle, std::vector<fcomplex>& theFirst,
                     std::vector<fcomplex>& theLast);
