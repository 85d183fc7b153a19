// The physical checks of a raw product's header: every value the chain reads from it, compared
// once, before any step reads it, with what a spaceborne SAR in a low Earth orbit can give.
// docs/header-checks.md lists each range and why it holds.
#pragma once

#include <string>
#include <vector>

class CDescriptionHeader;

/// Refuses the first impossible value of a raw product's header with 848647 and words that name
/// the field, its value and the range it must lie in (also in the trace). Fields that hold no
/// value are left to the steps that need them; a processing velocity of 0 (estimated by the
/// chain) and a missing Doppler table keep their meaning.
void fdfCheckRawHeader(const CDescriptionHeader& theHeader);

/// Reads "<theInput>_hdr" and checks it. A header that cannot be read is left to the steps,
/// which report it as a missing file.
void fdfCheckRawHeaderOf(const std::string& theInput);

/// Whether a run of these steps reads the echoes of a raw product: it holds step 1 (Doppler
/// centroid from the echoes) or step 2 (range compression). A run that begins later, on a range
/// compressed product or an SLC, has no raw header to check.
bool fdfStepsReadRawEchoes(const std::vector<int>& theSteps);

/// The known sensor name nearest to theName when theName is a near miss (at most 3 edits away,
/// fewer than its own length, or the same letters ignoring case, dashes and underscores); "" else.
std::string fdfNearestSensorName(const std::string& theName);
