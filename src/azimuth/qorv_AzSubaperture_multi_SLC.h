// Multi-look of an SLC that holds several azimuth subapertures: the power of all of them summed
// into one intensity image.
#pragma once

/// argv: title, SLC file, MLI file, processing parameter file, range looks and azimuth looks
/// (optional; default sar_processing RgDetectionLooks and AzDetectionLooks). The subaperture
/// count is sar_processing AzSubaperture; subaperture s holds the SLC lines s*H .. s*H+H-1, H
/// being the header's line count. Writes "<MLI>" (FLOAT, null 0.0) and its header; returns 0.
int qorv_AzSubaperture_multi_SLC(int argc, char** argv);
