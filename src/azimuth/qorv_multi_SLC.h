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

/// The suggested looks rule on a header file: "<name>_hdr", else "<name>_slc_hdr", else
/// "<name>_slc". The range angle is 23 degrees unless ChannelInfo.RadarsatLookAngle,
/// RangeLookAngle or IncidenceAngle hold one (the last of them wins); the azimuth angle is 90.
/// Answers 1 with looks and ground spacings (m), -1 when no header loads or the rule can't apply.
int fqorvSuggestedLooksFromFile(const char* theName, int& theRangeLooks, int& theAzimuthLooks,
                                double& theRangeGroundSpacing, double& theAzimuthGroundSpacing);

/// Step 6 "multi look". argv: title, SLC image, MLI image, processing parameter file (not
/// opened), range looks, azimuth looks (below 1: the suggested looks), gate value, "OK" when a cut
/// file replaces the MLI by renaming, cut border size ("NotOK": -1), cut minimum value ("NotOK":
/// no threshold). Writes "<MLI>" and its header; returns 0, failures end the process.
int qorv_multi_SLC(int argc, char** argv);

/// Step 6 for other code: looks as numbers (passed as "%lf" text, used by their integer part),
/// theCutByRename for argument 7 ("OK"), theGate16000 for argument 6 ("16000", else "NotOK"),
/// cut size and minimum value as text ("NotOK": none). True when the step returned 0.
bool fqorvMultiLookImage(const char* theSlc, const char* theMli, double theAzimuthLooks, double theRangeLooks,
                         bool theCutByRename, bool theGate16000, const char* theCutPixelsSize,
                         const char* theMinValueAdmit);
