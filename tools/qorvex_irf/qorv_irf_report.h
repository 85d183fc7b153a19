// The result of a point-target analysis: per-target figures, the ideal ones, a summary, and their
// two renditions, a text table and a JSON document.
#pragma once

#include <string>
#include <vector>

#include "qorv_irf_measure.h"
#include "qorv_irf_truth.h"
#include "qorv_json.h"

/// One target's measurement against its truth.
struct CIrfTargetResult {
    CIrfTarget mTarget;
    CIrfResponse mResponse;
    double mLineError = 0.0;     // measured - expected, lines
    double mPixelError = 0.0;    // measured - expected, pixels
    double mPhaseErrorDeg = 0.0; // measured - expected peak phase, degrees in (-180, 180]; with a phase only
};

/// Figures over the measured targets.
struct CIrfSummary {
    int mMeasured = 0;
    int mFailed = 0;
    double mRmsLineError = 0.0, mMaxLineError = 0.0;    // lines (max of |error|)
    double mRmsPixelError = 0.0, mMaxPixelError = 0.0;  // pixels
    double mMeanRangeIrw = 0.0, mMaxRangeIrw = 0.0;     // samples
    double mMeanAzimuthIrw = 0.0, mMaxAzimuthIrw = 0.0; // lines
    double mWorstRangePslr = 0.0, mWorstRangeIslr = 0.0;     // dB, the highest
    double mWorstAzimuthPslr = 0.0, mWorstAzimuthIslr = 0.0; // dB, the highest
};

/// Everything one run found.
struct CIrfReport {
    std::string mSlc;
    std::string mTruthPath;
    CIrfOptions mOptions;
    CIrfIdeal mIdeal;
    CIrfTruth mTruth;
    int mImageLines = 0;
    int mImagePixels = 0;
    std::vector<CIrfTargetResult> mTargets;
};

/// Fills the errors of a result from its response and target.
void fqorvIrfCompare(CIrfTargetResult& theResult);
/// Figures over the targets whose response was found.
CIrfSummary fqorvIrfSummarise(const CIrfReport& theReport);
/// The table printed by the tool: one row per target, the ideal row and the summary.
std::string fqorvIrfFormatTable(const CIrfReport& theReport);
/// The JSON report: options, ideal figures, one object per target, summary.
CJson fqorvIrfReportJson(const CIrfReport& theReport);
