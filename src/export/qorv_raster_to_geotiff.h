// Steps 7 and 8 of the chain: an 8-bit TIFF rendition of a float or complex raster, with GeoTIFF
// keys for a geocoded header and the product's header beside it.
#pragma once

/// Output pixels of a TIFF: lines and columns averaged into one pixel, and the output size.
struct CTiffWindow {
    int mRowWin = 1, mColWin = 1, mRowsOut = 0, mColsOut = 0;
};
/// The window of theLines x thePixels: sizes below 1 become 1; a negative theColWin is automatic
/// (the larger dimension shrinks until the output is about square). Remainders are dropped.
CTiffWindow fqorvTiffWindow(int theLines, int thePixels, int theRowWin, int theColWin);

/// The entry of steps 7 ("multi look to tiff conversion") and 8 ("slc to tiff conversion"):
/// argv = title, input raster, output TIFF [, saturation, row window, column window, scale,
/// exponent, reserved, columns inverted "OK", rows inverted "OK"]. Returns 0; failures end the run.
int qorv_raster_to_geotiff(int argc, char** argv);
