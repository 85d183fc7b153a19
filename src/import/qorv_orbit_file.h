// Outside orbit files, read in place of the orbit an archive carries. Two kinds, told by their
// content:
//
// A plain text table of Earth-fixed state vectors that users write from any precise orbit:
//
//   # comment lines and blank lines are skipped
//   1997-05-14T10:21:00.000000  4046591.425 -2337540.071 5423969.442  -5784.637807 992.134184 4743.245594
//
// One vector a line: a UTC time "YYYY-MM-DDThh:mm:ss" with an optional fraction of the second,
// then x y z (m) and vx vy vz (m/s, relative to the rotating Earth), separated by blanks or tabs.
//
// A DORIS precise orbit (DOR_VOR_AX), an ENVISAT-format product: a main product header of 1247
// bytes that begins PRODUCT="DOR_VOR_AX..., a specific product header of SPH_SIZE bytes (378),
// then one record of 129 ASCII bytes per state vector, ending in a line feed:
//
//   01-MAR-2004 10:00:00.000000  0.123456  -1234567.890  5234567.125  4234567.500  1234.567890 -2234.567890 7034.000000 0001
//
// the UTC time "DD-MMM-YYYY hh:mm:ss.uuuuuu", then blank-separated dUT1 (s, not used), x y z (m),
// vx vy vz (m/s), Earth-fixed, and a quality text; records are usually 60 s apart over a day.
#pragma once

#include <filesystem>
#include <vector>

#include "qorv_state_vectors.h"

/// The state vectors of an orbit file, times in seconds from the midnight (UTC) of theReferenceDay
/// (days since 1 January 1970). Throws CImportFailure: 261122 when the file does not exist, 979211
/// for a line or record that does not parse (its number and text) or fewer than 4 vectors, 979206
/// when the times do not increase strictly (the line or record at fault), 979213 for an
/// ENVISAT-format product that is no DORIS orbit.
std::vector<CStateVector> fqorvReadOrbitFile(const std::filesystem::path& thePath, long theReferenceDay);
