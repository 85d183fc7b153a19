// Acquisition geometry of the simulator: range history, Doppler, zero-Doppler and beam-centre
// times, the azimuth angle off the beam, effective velocity, and the inverse problem (the ground
// point of a zero-Doppler time and a slant range; the orbit that sees a scene centre).
//
// Conventions, the chain's: the Doppler of a target is f = 2 v.u / lambda with v the satellite's
// Earth-fixed velocity and u the unit vector from the satellite to the target, so f is positive
// while the target approaches. The antenna beam is pointed so that the Doppler at its centre is
// the scene's Doppler centroid fdc: the beam centre is the cone of directions u with
// v^.u = sin(theta_c), sin(theta_c) = lambda fdc / (2 |v|), and the azimuth angle of a target off the
// beam centre is psi = asin(v^.u) - theta_c. This holds at every range, so the Doppler centroid is
// fdc across the swath, and fdc may lie beyond +-PRF/2.
#pragma once

#include "qorv_sim_geodesy.h"
#include "qorv_sim_orbit.h"

/// Geometry of one orbit with a wavelength and a beam pointing.
class CSimGeometry {
public:
    /// theWavelength in m; theDopplerCentroid in Hz (the Doppler at the beam centre).
    CSimGeometry(const CSimOrbit& theOrbit, double theWavelength, double theDopplerCentroid);

    const CSimOrbit& orbit() const { return mOrbit; }
    double wavelength() const { return mWavelength; }
    double dopplerCentroid() const { return mDopplerCentroid; }

    /// Slant range (m) from the satellite at theTime (s) to the point.
    double range(double theTime, const CSimVec3& thePoint) const;
    /// Doppler frequency (Hz) of the point at theTime: 2 v.u / lambda.
    double doppler(double theTime, const CSimVec3& thePoint) const;
    /// Doppler rate (Hz/s) of the point at theTime (central difference of the Doppler).
    double dopplerRate(double theTime, const CSimVec3& thePoint) const;
    /// Azimuth angle (rad) of the point off the beam centre at theTime; positive ahead of the beam.
    double azimuthOffBeam(double theTime, const CSimVec3& thePoint) const;

    /// The time (s) at which v.(P - S) = 0, searched from theGuess.
    double zeroDopplerTime(const CSimVec3& thePoint, double theGuess = 0.0) const;
    /// The time (s) at which the point's Doppler equals theDoppler (Hz).
    double timeOfDoppler(const CSimVec3& thePoint, double theDoppler, double theGuess) const;
    /// The time (s) at which the point crosses the beam centre (its Doppler is the centroid).
    double beamCentreTime(const CSimVec3& thePoint, double theGuess) const
    {
        return timeOfDoppler(thePoint, mDopplerCentroid, theGuess);
    }
    /// The time (s) at which the azimuth angle off the beam is thePsi (rad), from theGuess.
    double timeOfAzimuthAngle(const CSimVec3& thePoint, double thePsi, double theGuess) const;

    /// Effective velocity (m/s) at zero Doppler: sqrt(R0 R''(t0)), the velocity of the hyperbola
    /// R(t)^2 = R0^2 + V^2 (t - t0)^2 that osculates the range history there.
    double effectiveVelocityAtZeroDoppler(const CSimVec3& thePoint, double theZeroDopplerTime) const;
    /// Effective velocity (m/s) of the hyperbola with the true t0 and R0 fitted by least squares to
    /// the range history over [theFrom, theTo] (s), theCount samples.
    double effectiveVelocityFit(const CSimVec3& thePoint, double theZeroDopplerTime, double theFrom, double theTo,
                                int theCount = 201) const;

    /// The point at height theHeight (m) above theEllipsoid seen at zero Doppler at theTime (s) at
    /// slant range theRange (m), to the right of the track for theLookSign +1, to the left for -1.
    CSimVec3 locate(double theTime, double theRange, double theHeight, int theLookSign,
                    const CSimEllipsoid& theEllipsoid) const;

private:
    const CSimOrbit& mOrbit;
    double mWavelength;
    double mDopplerCentroid;
};

/// Incidence angle (rad) at thePoint from theSatellite, against the ellipsoid normal.
double fqorvSimIncidenceAngle(const CSimVec3& theSatellite, const CSimVec3& thePoint, const CSimEllipsoid& theEllipsoid);
/// Look angle (rad) off the geocentric nadir.
double fqorvSimLookAngle(const CSimVec3& theSatellite, const CSimVec3& thePoint);
/// Heading (degrees from north, 0 .. 360) of a velocity at a point.
double fqorvSimHeading(const CSimVec3& thePoint, const CSimVec3& theVelocity, const CSimEllipsoid& theEllipsoid);
/// +1 when thePoint lies to the right of the satellite's track, -1 to the left.
int fqorvSimLookSide(const CSimState& theSatellite, const CSimVec3& thePoint);

/// Sets mRaan and mM0 of theElements (other elements as given) so that at t = 0 the satellite sees
/// theTarget at zero Doppler under theIncidence (rad), looking right (theLookSign +1) or left (-1),
/// on a descending or an ascending pass. Returns false when the search does not converge.
bool fqorvSimPlaceOrbit(CSimKepler& theElements, const CSimVec3& theTarget, double theIncidence, int theLookSign,
                        bool theAscending, const CSimEllipsoid& theEllipsoid);
