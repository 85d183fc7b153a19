// Whole-image operations on the chain's products, each streaming the raster line by line:
// normalisation of an SLC to a target mean power, cutting of null borders, image statistics.
#pragma once

#include "qorv_image_stats.h"

class CRasterFile;

/// Normalises the complex raster theRaster (header theHeader) in place so that its mean amplitude
/// over the central sample becomes sqrt(aNormalizeValue) (16000.0 in the chain: mean power 16000):
/// factor = sqrt(aNormalizeValue) / (mean + theNbrOfStd x std). Null cells are kept. Writes the
/// user keys "NORMALIZATION FACTOR" and "NORMALIZATION MEAN" (and scales "CalConstProc" when set)
/// and saves the header under theRaster's name. With theFlag and a non-null thePointer, the factor
/// is also stored into *(double*)thePointer. theLast is reserved (0.3333 in the chain).
void fqorvNormalizeRaster(const char* theRaster, const char* theHeader, double aNormalizeValue, double theNbrOfStd,
                          bool theFlag, void* thePointer, double theLast);

/// Copies the smallest rectangle holding every non-dummy cell of theIn, widened by aCutPixelsSize
/// on each side within the image, into theOut with its own header. A cell is dummy when it equals
/// "NullCellValue" or, unless aMinValueAdmit is -999999.0, is at most aMinValueAdmit (complex
/// cells: their power). Returns 1 when a cut file was written, 0 when nothing is to be cut.
int fqorvCutDummyValues(const char* theIn, const char* theOut, int aCutPixelsSize, double aMinValueAdmit);

/// Statistics of the values of an open raster (amplitude of complex cells, the value of real
/// cells; sqrt|v| accumulated for power units) over the central sample window, the whole image
/// when the window holds no non-null cell. No non-null cell at all is failure 261126.
/// Progress runs from thePercentFrom to thePercentTo (a negative thePercentFrom: none).
CImageStats fqorvImageStatistics(CRasterFile& theFile, bool theRootOfValue, int thePercentFrom = -1,
                                 int thePercentTo = -1);
