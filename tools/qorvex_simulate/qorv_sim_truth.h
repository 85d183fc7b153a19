// Where every target must appear in the focused image, and the scene's true Doppler and
// velocity: the truth file of a simulated acquisition.
//
// expected_line = the fractional pulse index at the target's zero-Doppler time (that is
// (t0 - t_start) * PRF while the PRF does not change); expected_pixel = (R0 - r_near) / dr with R0
// the zero-Doppler slant range and r_near = c tau_first / 2 the range of the first sample of the
// first pulse's window.
#pragma once

#include <string>
#include <vector>

#include "qorv_json.h"
#include "qorv_sim_scene.h"
#include "qorv_sim_timeline.h"

/// The truth of one target.
struct CSimTargetTruth {
    const CSimTarget* mTarget = nullptr;
    double mLat = 0.0, mLon = 0.0, mHeight = 0.0;  // degrees, m (on the scene's ellipsoid)
    double mZeroDopplerTime = 0.0;                 // s from the epoch
    double mSlantRange = 0.0;                      // R0, m
    double mExpectedLine = 0.0;
    double mExpectedPixel = 0.0;
    double mBeamCentreTime = 0.0;                  // s from the epoch
    double mDopplerCentroid = 0.0;                 // Doppler at the beam centre, Hz
    double mFmRate = 0.0;                          // Doppler rate at the beam centre, Hz/s
    double mVrZeroDoppler = 0.0;                   // m/s
    double mVrFit = 0.0;                           // m/s, hyperbola fitted over the processed band
    double mApertureFirst = 0.0, mApertureLast = 0.0;  // lines of the 0.8 PRF Doppler band
    bool mFullAperture = false;
    bool mGapInAperture = false;
    bool mIsolated = true;
    double mExpectedPhaseDeg = 0.0;                // peak phase of an exact matched filter
};

/// The truth of a scene.
struct CSimSceneTruth {
    std::vector<CSimTargetTruth> mTargets;          // listed targets only, in scene order
    // The image centre: middle line, middle of the compressed swath.
    CSimVec3 mCentre;
    double mCentreLat = 0.0, mCentreLon = 0.0, mCentreHeight = 0.0;
    double mCentreRange = 0.0, mCentreZeroDopplerTime = 0.0, mCentreBeamCentreTime = 0.0;
    double mCentreLine = 0.0, mCentrePixel = 0.0;
    double mIncidenceDeg = 0.0, mLookAngleDeg = 0.0, mHeadingDeg = 0.0;
    double mGroundVelocity = 0.0;                    // m/s of the zero-Doppler point on the ground
    double mFmRate = 0.0;                            // Hz/s at the image centre
    double mProcessingVelocity = 0.0;                // m/s, fitted over the processed band
    double mVrZeroDoppler = 0.0;                     // m/s
    double mNearRange = 0.0;                         // r_near, m
    int mCompressedWidth = 0;                        // samples - replica points
};

/// Computes the truth of a completed scene.
CSimSceneTruth fqorvSimComputeTruth(const CSimScene& theScene, const CSimOrbit& theOrbit, const CSimTimeline& theTimeline);

/// Figures of a finished run that the truth file records.
struct CSimRunFigures {
    std::string mRasterName;
    std::string mHeaderName;
    double mGain = 0.0;              // codes per unit amplitude (5-bit formats)
    double mClippedFraction = 0.0;   // of all components
    double mNoiseVariance = 0.0;     // complex, per sample
    double mAzimuthGain = 0.0;
    double mRangeGain = 0.0;
    double mSignalPower = 0.0;       // mean |s|^2 per sample of the noise-free echoes (estimate)
};

/// The truth file's JSON (key names shared with the other simulators' truth files).
CJson fqorvSimTruthJson(const CSimScene& theScene, const CSimSceneTruth& theTruth, const CSimTimeline& theTimeline,
                        const CSimOrbit& theOrbit, const CSimRunFigures& theFigures);

/// State vectors for the header and the truth: TimeFirst on a whole second, theStep apart,
/// covering the scene with a margin of at least two vectors on each side; at least theMinimum.
struct CSimStateVectors {
    double mFirst = 0.0;   // s from the epoch
    double mStep = 10.0;
    std::vector<CSimState> mStates;
};
CSimStateVectors fqorvSimStateVectors(const CSimScene& theScene, const CSimOrbit& theOrbit, const CSimTimeline& theTimeline,
                                      double theStep = 10.0, int theMinimum = 7);
