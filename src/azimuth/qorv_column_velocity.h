// The effective velocity of every range column, for the precise azimuth mode: the orbit of the
// header's state vectors gives how the velocity of a fixed target's range history changes with
// slant range, and the processing velocity (the header's or the autofocus estimate) fixes its level
// at the scene's centre range.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "qorv_state_vectors.h"

class CDescriptionHeader;

class CColumnVelocityModel {
public:
    /// The model of a data header, or nothing when its orbit cannot give one; theReason then says why
    /// in words for the log.
    static std::optional<CColumnVelocityModel> fromHeader(const CDescriptionHeader& theData, double theProcessingVelocity,
                                                          std::string& theReason);

    /// The velocities (m/s) of theCount columns, column k at slant range theNearRange + k theSpacing (m),
    /// at input line theLine. Empty when the orbit gives no target at one of those ranges.
    std::vector<double> velocities(double theNearRange, double theSpacing, int theCount, double theLine) const;

private:
    CColumnVelocityModel(CStateVectorOrbit theOrbit) : mOrbit(std::move(theOrbit)) {}
    /// Orbit time (s) of input line theLine.
    double lineTime(double theLine) const { return mStartTime + theLine / mPrf; }

    CStateVectorOrbit mOrbit;
    double mStartTime = 0.0;   // first line, seconds after the first state vector
    double mPrf = 0.0;
    double mHeight = 0.0;      // reference height of the targets (m)
    int mLookSign = 1;         // +1 right of the track
    double mScale = 1.0;       // processing velocity / orbit velocity at the centre range
};
