// The two services of other libraries that the multi-look step calls: the frame conversion of
// the state vectors (orbit library) and the dummy cutting of a raster (export library).
#pragma once

class CDescriptionHeader;

/// Rotates the inertial ("IRS") state vectors of a store to the Earth-fixed frame and marks the
/// store "ECR"; the orbit library's store operation.
void fqorvMultiLookConvertStateVectors(CDescriptionHeader& theStore);

/// Cuts the null borders of raster theIn into theOut (both with headers); 1 when a cut file was
/// written. aMinValueAdmit -999999.0: no value threshold. The export library's dummy cutting.
int fqorvMultiLookCutDummyValues(const char* theIn, const char* theOut, int aCutPixelsSize, double aMinValueAdmit);

/// Renames a raster and its header files ("_hdr", ".sml", ".hdr"; missing ones are skipped) to
/// theTo; a rename that fails is failure 261123.
void fqorvRenameProduct(const char* theFrom, const char* theTo);

/// Copies a raster and its header files over theTo, keeping theFrom; failure 261124.
void fqorvCopyProduct(const char* theFrom, const char* theTo);
