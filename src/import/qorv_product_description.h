// What the header of an imported raw product states beyond its lines: the radar values (the
// archive's; for ERS the image mode's constants where it states none), the window of the first
// line (ERS: SWST code, rank 9 and delay bias; ASAR: SWST in samples, the beam set's rank and the
// instrument's range gate bias; ALOS: the slant range its records state), the
// times, the orbit, and the scene centre with its incidence and effective velocity, worked out from
// the orbit at the product's own middle line and middle range (so that a product cut out of a long
// segment describes itself, not the segment).
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "qorv_line_plan.h"
#include "qorv_native_archive.h"

struct CProductDescription {
    // Radar
    double mCarrier = 0.0;            // Hz
    double mSamplingRate = 0.0;       // Hz
    double mChirpRate = 0.0;          // Hz/s, signed: ERS and ASAR chirps rise, ALOS chirps fall
    double mPulseLength = 0.0;        // s
    double mBandwidth = 0.0;          // Hz, |K| T
    double mPrf = 0.0;                // Hz, of the product's PRI code
    int mSamples = 0;                 // complex samples per line
    // Window of the first line: the first sample's two-way delay, and the slant ranges of the
    // first, middle (N/2) and last sample.
    double mFirstDelay = 0.0;         // s
    double mNearRange = 0.0, mCentreRange = 0.0, mFarRange = 0.0;   // m
    double mRangeSpacing = 0.0;       // m, c / (2 fs)
    double mSceneRange = 0.0;         // m, the middle of the range compressed swath (the window less
                                      // the chirp's samples): the focused image's mid range
    // Times, s from the archive's reference day: the transmit times of the first and last pulse.
    double mStartTime = 0.0, mStopTime = 0.0;
    // The scene centre: middle pulse, the focused image's mid range, zero Doppler, on the ellipsoid.
    double mCentreLatitude = 0.0, mCentreLongitude = 0.0;    // deg
    double mIncidenceDeg = 0.0, mLookDeg = 0.0, mHeadingDeg = 0.0;
    double mProcessingVelocity = 0.0; // m/s, effective velocity at the centre
    double mAzimuthSpacing = 0.0;     // m, ground distance between pulses at the centre (approximate)
    // Orbit for the header: equally spaced Earth-fixed vectors that cover the product.
    std::vector<CStateVector> mStateVectors;
    double mStateVectorStep = 0.0;    // s
    std::string mOrbitSource;
    std::vector<std::string> mNotes;
    std::vector<std::pair<int, std::string>> mWarnings;   // warning id of the catalogue, words
};

/// Describes a planned product of theArchive. theOutsideOrbit (may be empty), named
/// theOrbitName, replaces the archive's state vectors when it is given. CImportFailure 979207 when
/// the orbit does not cover the product (the vectors' span, extended by one spacing at each end,
/// must hold every pulse; a single vector may be at most an hour from the product), 979210 when the
/// window reaches no ground or a radar value is impossible (or, for ASAR and ALOS, not stated).
CProductDescription fqorvDescribeProduct(const CNativeArchive& theArchive, const CPlannedProduct& theProduct,
                                         const std::vector<CStateVector>& theOutsideOrbit,
                                         const std::string& theOrbitName);
