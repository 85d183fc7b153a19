// The file front end of the point-target analysis: reads the windows around the truth's targets
// from a focused SLC (flat raster and its header) and measures them.
//
// The runtime must be up (fdfInit) before these functions run: the header store takes its key
// files from the settings.
#pragma once

#include <stdexcept>
#include <string>

#include "qorv_irf_measure.h"
#include "qorv_irf_report.h"
#include "qorv_irf_truth.h"

/// Bad input of the analysis (missing header, a target outside the image, a real raster); the
/// message is meant for the user as it stands.
class CIrfInputError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

/// What a run is asked to do beyond the measurement itself.
struct CIrfRunOptions {
    CIrfOptions mMeasure;
    double mAzFraction = 0.0;        // processed azimuth bandwidth / PRF; 0: the header's
                                     // "sar_processing.AzBandWidthFraction" when set, else 0.8
    bool mOnlyIsolated = false;      // skip targets whose truth says isolated: false
    double mPatternVelocity = 0.0;   // V of the ideal's antenna pattern, m/s; 0: from the truth
};

/// Default processed azimuth bandwidth, fraction of the PRF.
inline constexpr double CQORV_IRF_DEFAULT_AZ_FRACTION = 0.8;

/// Measures every target of a truth in the SLC theSlc (its header theSlc.sml, or theSlc_hdr).
/// Throws CIrfInputError for a header that can't be read, a raster that is not complex or a
/// target outside the image.
CIrfReport fqorvIrfAnalyseSlc(const std::string& theSlc, const CIrfTruth& theTruth, const std::string& theTruthPath,
                              const CIrfRunOptions& theOptions);
