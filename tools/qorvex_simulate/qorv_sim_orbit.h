// Orbits of the raw-data simulator: a two-body Kepler orbit propagated to Earth-fixed state
// vectors, and an orbit given by state vectors alone.
//
// Times are seconds from the scene's epoch (a UTC instant held by the scene). States are ECEF:
// position in m, velocity in m/s relative to the rotating Earth.
#pragma once

#include <vector>

#include "qorv_sim_geodesy.h"

/// Position and velocity (ECEF, m and m/s).
struct CSimState {
    CSimVec3 mPos;
    CSimVec3 mVel;
};

/// Keplerian elements at the epoch (t = 0). Angles in radians, a in m.
struct CSimKepler {
    double mA = 7159500.0;        // semi-major axis
    double mE = 0.001165;         // eccentricity
    double mInc = 98.52 * CQORV_SIM_DEG;
    double mRaan = 0.0;           // right ascension of the ascending node
    double mArgp = 90.0 * CQORV_SIM_DEG;  // argument of perigee
    double mM0 = 0.0;             // mean anomaly at the epoch
    double mThetaG0 = 0.0;        // Greenwich angle at the epoch: inertial x to Earth-fixed x
    double mMu = 3.986004418e14;  // gravitational parameter, m^3/s^2
    double mOmegaEarth = 7.2921151467e-5;  // Earth rotation rate, rad/s
};

/// The orbit of a scene: Earth-fixed state at any time.
class CSimOrbit {
public:
    virtual ~CSimOrbit() = default;
    /// ECEF state at theTime (s from the epoch).
    virtual CSimState state(double theTime) const = 0;
};

/// Two-body motion from Keplerian elements, rotated into the Earth-fixed frame by the Greenwich
/// angle mThetaG0 + mOmegaEarth t. No perturbations: the same orbit gives the state vectors of the
/// header and the range of every pulse, which is what the chain must reproduce.
class CSimKeplerOrbit : public CSimOrbit {
public:
    explicit CSimKeplerOrbit(const CSimKepler& theElements) : mK(theElements) {}
    CSimState state(double theTime) const override;
    /// Inertial state (m, m/s) at theTime.
    CSimState inertial(double theTime) const;
    /// Mean anomaly at the epoch that puts the argument of latitude theU (rad) at t = 0.
    static double meanAnomalyForArgumentOfLatitude(const CSimKepler& theElements, double theU);
    const CSimKepler& elements() const { return mK; }

private:
    CSimKepler mK;
};

/// An orbit given by Earth-fixed state vectors: positions and velocities each interpolated by a
/// Lagrange polynomial through the (up to) ten vectors nearest in time.
class CSimVectorOrbit : public CSimOrbit {
public:
    /// theTimes increasing (s from the epoch), one state per time; at least 4 vectors.
    CSimVectorOrbit(std::vector<double> theTimes, std::vector<CSimState> theStates);
    CSimState state(double theTime) const override;

private:
    std::vector<double> mTimes;
    std::vector<CSimState> mStates;
};

/// Samples an orbit at theCount times theFirst + i theStep (s).
std::vector<CSimState> fqorvSimSampleOrbit(const CSimOrbit& theOrbit, double theFirst, double theStep, int theCount);
