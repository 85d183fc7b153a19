// The suggested looks rule: looks that make the multi-looked ground pixel roughly square.
#include <cmath>

#include "qorv_multi_SLC.h"

bool fqorvSuggestedLooks(double thePixelSpacingRg, double thePixelSpacingAz, double theIncidenceDeg,
                         double theAzimuthAngleDeg, int& theRangeLooks, int& theAzimuthLooks,
                         double& theRangeGroundSpacing, double& theAzimuthGroundSpacing)
{
    const double aDegToRad = M_PI / 180.0;
    const double aRgGroundPixelSpace = std::fabs(thePixelSpacingRg / std::sin(theIncidenceDeg * aDegToRad));
    const double aAzGroundPixelSpace = std::fabs(thePixelSpacingAz / std::sin(theAzimuthAngleDeg * aDegToRad));
    const bool aUsable = std::isfinite(aRgGroundPixelSpace) && std::isfinite(aAzGroundPixelSpace) &&
                         aRgGroundPixelSpace > 0.0 && aAzGroundPixelSpace > 0.0;
    if (!aUsable) return false;

    // The ratio of coarser to finer is at least 1, so neither look count can be 0. A ratio beyond
    // the int range means a spacing that no sensor has: refuse it rather than overflow.
    const double aRatio = aAzGroundPixelSpace <= aRgGroundPixelSpace ? aRgGroundPixelSpace / aAzGroundPixelSpace
                                                                     : aAzGroundPixelSpace / aRgGroundPixelSpace;
    if (!(aRatio < 2147483647.0)) return false;
    const int aLooks = static_cast<int>(aRatio);
    theRangeLooks = aAzGroundPixelSpace <= aRgGroundPixelSpace ? 1 : aLooks;
    theAzimuthLooks = aAzGroundPixelSpace <= aRgGroundPixelSpace ? aLooks : 1;
    theRangeGroundSpacing = theRangeLooks * aRgGroundPixelSpace;
    theAzimuthGroundSpacing = theAzimuthLooks * aAzGroundPixelSpace;
    return true;
}
