// Step 5 "SAR azimuth omega/k processor": range compressed data in, single look complex image out.
#pragma once

/// argv: title, range compressed file, output SLC, processing parameter file, presumming factor,
/// subaperture count (also the decimation factor), azimuth FFT size, line offset of the first
/// processed record, processed records (0: "ProcessedLines"), [range FFT size], [fixed-size
/// products' azimuth FFT size]. Returns 0; failures end the process.
int qorv_az_SLC(int argc, char** argv);

/// Shut function of step 5: removes the raster named by argv[1]; fewer than two entries fail with
/// 456962. Returns 1.
int qorv_az_SLC_shut(int argc, char** argv);
