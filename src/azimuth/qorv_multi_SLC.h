// Step 6 "multi look": the SLC becomes a multi-looked intensity image, each output pixel the mean
// power of a rectangle of range looks by azimuth looks. Also the suggested looks rule that the
// focusing step uses to choose looks for a roughly square ground pixel.
#pragma once

/// The suggested looks rule. Slant range spacing and azimuth spacing in metres, incidence (range
/// look) angle and azimuth angle in degrees. The finer of the two ground spacings
/// |spacing / sin(angle)| is given trunc(coarser / finer) looks, the other 1; the ground spacings
/// answered are looks times ground spacing, in metres. False (outputs untouched) when the
/// spacings or angles give no finite, positive ground spacing.
bool fqorvSuggestedLooks(double thePixelSpacingRg, double thePixelSpacingAz, double theIncidenceDeg,
                         double theAzimuthAngleDeg, int& theRangeLooks, int& theAzimuthLooks,
                         double& theRangeGroundSpacing, double& theAzimuthGroundSpacing);

