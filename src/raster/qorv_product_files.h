// A product on disk: a raster with its header files ("_hdr", ".sml", ".hdr"), renamed or copied as one,
// so that a step can write under a temporary name and give the product its name at the end.
#pragma once

/// Renames a raster and its header files ("_hdr", ".sml", ".hdr"; missing ones are skipped) to
/// theTo; a rename that fails is failure 261123.
void fqorvRenameProduct(const char* theFrom, const char* theTo);

/// Copies a raster and its header files over theTo, keeping theFrom; failure 261124.
void fqorvCopyProduct(const char* theFrom, const char* theTo);
