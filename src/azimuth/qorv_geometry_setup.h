// The spaceborne geometry set-up shared by the azimuth steps (autofocus, Doppler ambiguity,
// omega-k): azimuth pixel spacing from the orbit and the Earth ellipsoid, the Doppler and aperture
// quantities that size their filters. The steps differ in a few points, held in CGeometryVariant.
#pragma once

#include <string>

#include "qorv_omegak_kernel.h"

class CDescriptionHeader;

/// Where a step's block and subaperture loops evaluate the Doppler centroid.
enum class EGeometryDopplerPosition {
    LookFilter,  // pixel width/2, line offset + nfir/2 - ndec + nazft (autofocus, ambiguity)
    BlockCentre  // pixel nrfft/2, line offset + nazft/2 (omega-k)
};

/// The points in which the three azimuth steps' set-ups differ.
struct CGeometryVariant {
    bool mUserVelocity;                 // "UserProcessingVelocity"[0] overrides "sar_processing.Velocity"
    bool mUserCoeffToOutput;            // "UserDopCenRangeCoeff" goes to the output header, else the input
    int mFixedDecimation;               // ndec; 0: the step's argument (the subaperture count)
    EGeometryDopplerPosition mDoppler;  // the loop's Doppler position
    int mMissingOrbitFailure;           // failure id when "vel" or "pos" is empty

    /// The loop's Doppler position (pixel, line) for a block starting at input line theOffset;
    /// the line is capped to theLastLine.
    void dopplerPosition(int theWidth, int theRangeFftSize, int theOffset, int theFirSize, int theDecimation,
                         int theAzimuthFftSize, int theLastLine, double& thePixel, double& theLine) const;
};

inline constexpr CGeometryVariant CQORV_GEOMETRY_AUTOFOCUS{false, false, 4, EGeometryDopplerPosition::LookFilter, 130560};
inline constexpr CGeometryVariant CQORV_GEOMETRY_AMBIGUITY{false, false, 4, EGeometryDopplerPosition::LookFilter, 261121};
inline constexpr CGeometryVariant CQORV_GEOMETRY_OMEGAK{true, true, 0, EGeometryDopplerPosition::BlockCentre, 848642};

/// What the set-up reads from the headers, in SI units (Hz, m, m/s, degrees).
struct CGeometryInput {
    double mCarrierFrequency = 0.0;  // f0
    double mSamplingRate = 0.0;      // fs
    double mPrf = 0.0;
    int mStateVectorNbr = 0;         // n; 0: no orbit
    double mPos[3] = {0.0, 0.0, 0.0};  // element n/2 of pos_x, pos_y, pos_z (m)
    double mVel[3] = {0.0, 0.0, 0.0};  // element n/2 of vel_x, vel_y, vel_z (m/s)
    double mLatitudeDeg = 0.0;       // scene centre
    double mLongitudeDeg = 0.0;
    double mReferenceHeight = 0.0;   // h
    double mNearRange = 0.0;         // r0, "Processing.SlantRange"[0]
    double mCentreRange = 0.0;       // rc, [1]
    double mFarRange = 0.0;          // rf, [2]
    double mVelocity = 0.0;          // processing velocity v
    double mBandFraction = 0.0;      // B, "sar_processing.AzBandWidthFraction"
    int mPresumming = 1;             // psf
    int mDecimation = 1;             // ndec
};

/// The quantities of the set-up. Frequencies in Hz, angles in radians unless named in degrees.
struct CSpaceborneGeometry {
    CGeometryInput mIn;
    double mRangeSpacing = 0.0;        // dr = c / (2 fs), m
    double mWavelength = 0.0;          // lambda, m
    double mSpacingNoOrbit = 0.0;      // psf ndec v / PRF, m
    double mSpacingOrbit = 0.0;        // azimsp_sc, m (0 without orbit)
    double mCosb = 0.0;                // cosine of the Earth-centre angle subradar point - swath centre
    double mCentroid = 0.0;            // fdc
    double mCentroidRad = 0.0;         // ws = 2 pi fdc / PRF
    double mPhi = 0.0;                 // angle between velocity and look vector
    double mFilterBandwidthRad = 0.0;  // wb = 2 pi B / ndec
    double mDopplerMin = 0.0, mDopplerMax = 0.0;  // fdc -+ PRF / (2 psf)
    double mClosestRange = 0.0;        // r0a at far range
    double mApertureRangeMin = 0.0, mApertureRangeMax = 0.0;

    bool hasOrbit() const { return mIn.mStateVectorNbr != 0; }
    /// Azimuth pixel spacing written to the header (m): the orbit value when there is an orbit.
    double azimuthSpacing() const { return hasOrbit() ? mSpacingOrbit : mSpacingNoOrbit; }
    /// Azimuth resolution (m): spacing / B.
    double azimuthResolution() const { return azimuthSpacing() / mIn.mBandFraction; }
    /// Slant range (m) of range sample thePixel: r0 + pixel * dr.
    double slantRange(double thePixel) const { return mIn.mNearRange + thePixel * mRangeSpacing; }
    /// Azimuth FM rate (Hz/s) at slant range theRange, broadside: -2 f0 v^2 / (r c).
    double fmRate(double theRange) const;
    /// Azimuth FM rate (Hz/s) at the centre range for a squint given by the Doppler centroid
    /// theCentroid (Hz): (1 - cos^2 phi_s) v^2 (-2 f0) / (rc c), cos phi_s = c fdc / (2 v f0).
    double fmRateSquinted(double theCentroid) const;
    /// Range R(f) (m) across the aperture at far range for Doppler theFrequency (Hz).
    double apertureRange(double theFrequency) const;
    /// Nominal reference length (azimuth lines, odd) of a band theBandwidth (Hz) at FM rate theRate.
    int apertureLines(double theBandwidth, double theRate) const;
};

/// Reads the set-up's input from the data header and the processing parameter section. With an
/// orbit announced and "vel_x" or "pos_x" empty, traces "Missing mandatory field " and fails with the
/// variant's id; a processing velocity of 0 or NaN fails with 130560.
CGeometryInput fqorvReadGeometryInput(const CDescriptionHeader& theData, const CDescriptionHeader& thePar,
                                      const CGeometryVariant& theVariant, int thePresumming, int theDecimation,
                                      const std::string& theHeaderName);

/// Computes the set-up for the Doppler centroid theCentroid (Hz) and prints every value to the
/// trace under its label.
CSpaceborneGeometry fqorvSpaceborneGeometry(const CGeometryInput& theIn, double theCentroid);

/// The block focuser's constants for a block of theAzimuthFftSize x theRangeFftSize samples whose
/// column 0 lies theFirstColumn range samples beyond the near range.
COmegaKParam fqorvBlockParam(const CSpaceborneGeometry& theGeometry, int theAzimuthFftSize, int theRangeFftSize,
                             int theFirstColumn);

/// The phase steps of a subaperture centroid theCentroid (Hz): ws = 2 pi fdc / PRF (plus 2 pi when
/// negative), ws1 = psf ws and ws2 = psf ndec ws, both modulo 2 pi; radians per line.
void fqorvSubapertureAngles(const CSpaceborneGeometry& theGeometry, double theCentroid, double& ws, double& ws1,
                            double& ws2);

/// Writes spacing and resolution in both directions and "ProcessingVelocity"[0] to theTarget, and,
/// when theSource sets "UserDopCenRangeCoeff", its [0][0] as the constant term of theTarget's
/// Doppler table (every row, in the table's form at hand).
void fqorvWriteGeometryFields(const CSpaceborneGeometry& theGeometry, const CDescriptionHeader& theSource,
                              CDescriptionHeader& theTarget);
