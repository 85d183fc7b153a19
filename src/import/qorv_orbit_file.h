// Outside orbit files: a plain text table of Earth-fixed state vectors that users write from any
// precise orbit, read in place of the orbit an archive carries.
//
//   # comment lines and blank lines are skipped
//   1997-05-14T10:21:00.000000  4046591.425 -2337540.071 5423969.442  -5784.637807 992.134184 4743.245594
//
// One vector a line: a UTC time "YYYY-MM-DDThh:mm:ss" with an optional fraction of the second,
// then x y z (m) and vx vy vz (m/s, relative to the rotating Earth), separated by blanks or tabs.
#pragma once

#include <filesystem>
#include <vector>

#include "qorv_state_vectors.h"

/// The state vectors of an orbit file, times in seconds from the midnight (UTC) of theReferenceDay
/// (days since 1 January 1970). Throws CImportFailure: 261122 when the file does not exist, 979211
/// for a line that does not parse (its number and text) or fewer than 4 vectors, 979206 when the
/// times do not increase strictly (the line at fault).
std::vector<CStateVector> fqorvReadOrbitFile(const std::filesystem::path& thePath, long theReferenceDay);
