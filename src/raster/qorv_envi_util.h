// ENVI headers beside the rasters, so that outside viewers and GDAL open the products.
//
// Every write of a raster's header file ends with writeRasterHeaderEnvi: it reads the header back,
// and writes "<raster>.hdr", a text of "key = value" lines whose key texts and value tables come from
// the description file <QORVEX_CEOS_DES_FILES_DIR>ENVI_descriptions_<type>.des (type "default").
#pragma once

#include <string>

/// Writes the ENVI header of the raster described by the header file thePath ("x_hdr" or
/// "x.sml" give "x.hdr"), with the description file of type "default". A missing header or
/// description file writes nothing (trace only); a file that can't be created is failure 261123.
void writeRasterHeaderEnvi(const char* thePath);
/// The same with the description file "ENVI_descriptions_" + theType + ".des".
void writeRasterHeaderEnvi(const char* thePath, const char* theType);

/// Registers writeRasterHeaderEnvi as the store's hook called at the end of every header write.
void fqorvRegisterEnviHeaderWriter();

/// Name of the ENVI header for a header path: "_hdr" or ".sml" cut, ".hdr" added.
std::string fqorvEnviHeaderName(const char* thePath);
/// True for the header paths that get no ENVI header (TIFF, orbit, processing parameter files).
bool fqorvEnviHeaderExcluded(const char* thePath);
