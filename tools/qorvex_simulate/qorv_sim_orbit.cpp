#include "qorv_sim_orbit.h"

#include <algorithm>
#include <stdexcept>

namespace {

/// Eccentric anomaly of mean anomaly theM (rad) by Newton's method.
double solveKepler(double theM, double theE)
{
    double aE = theE < 0.8 ? theM : CQORV_SIM_PI;
    for (int i = 0; i < 50; ++i) {
        const double f = aE - theE * std::sin(aE) - theM;
        const double aStep = f / (1.0 - theE * std::cos(aE));
        aE -= aStep;
        if (std::fabs(aStep) < 1e-15) break;
    }
    return aE;
}

/// Rotation of a perifocal vector into the inertial frame: R3(-raan) R1(-inc) R3(-argp).
CSimVec3 perifocalToInertial(const CSimKepler& k, double px, double py)
{
    const double co = std::cos(k.mRaan), so = std::sin(k.mRaan);
    const double ci = std::cos(k.mInc), si = std::sin(k.mInc);
    const double cw = std::cos(k.mArgp), sw = std::sin(k.mArgp);
    const double xx = co * cw - so * sw * ci, xy = -co * sw - so * cw * ci;
    const double yx = so * cw + co * sw * ci, yy = -so * sw + co * cw * ci;
    const double zx = sw * si, zy = cw * si;
    return {xx * px + xy * py, yx * px + yy * py, zx * px + zy * py};
}

}  // namespace

CSimState CSimKeplerOrbit::inertial(double theTime) const
{
    const double n = std::sqrt(mK.mMu / (mK.mA * mK.mA * mK.mA));
    const double aE = solveKepler(std::remainder(mK.mM0 + n * theTime, 2.0 * CQORV_SIM_PI), mK.mE);
    const double cE = std::cos(aE), sE = std::sin(aE);
    const double q = std::sqrt(1.0 - mK.mE * mK.mE);
    // Perifocal position and velocity through the eccentric anomaly.
    const double px = mK.mA * (cE - mK.mE), py = mK.mA * q * sE;
    const double aDotE = n / (1.0 - mK.mE * cE);
    const double vx = -mK.mA * sE * aDotE, vy = mK.mA * q * cE * aDotE;
    return {perifocalToInertial(mK, px, py), perifocalToInertial(mK, vx, vy)};
}

CSimState CSimKeplerOrbit::state(double theTime) const
{
    const CSimState s = inertial(theTime);
    const double aTheta = mK.mThetaG0 + mK.mOmegaEarth * theTime;
    const double c = std::cos(aTheta), sn = std::sin(aTheta);
    CSimState e;
    e.mPos = {c * s.mPos.x + sn * s.mPos.y, -sn * s.mPos.x + c * s.mPos.y, s.mPos.z};
    const CSimVec3 v{c * s.mVel.x + sn * s.mVel.y, -sn * s.mVel.x + c * s.mVel.y, s.mVel.z};
    // Velocity relative to the rotating frame: v_ecef = R v_eci - omega x r_ecef.
    e.mVel = {v.x + mK.mOmegaEarth * e.mPos.y, v.y - mK.mOmegaEarth * e.mPos.x, v.z};
    return e;
}

double CSimKeplerOrbit::meanAnomalyForArgumentOfLatitude(const CSimKepler& theElements, double theU)
{
    const double nu = theU - theElements.mArgp;
    const double e = theElements.mE;
    const double aE = 2.0 * std::atan(std::sqrt((1.0 - e) / (1.0 + e)) * std::tan(nu / 2.0));
    return std::remainder(aE - e * std::sin(aE), 2.0 * CQORV_SIM_PI);
}

CSimVectorOrbit::CSimVectorOrbit(std::vector<double> theTimes, std::vector<CSimState> theStates)
    : mTimes(std::move(theTimes)), mStates(std::move(theStates))
{
    if (mTimes.size() != mStates.size() || mTimes.size() < 4)
        throw std::invalid_argument("an orbit by state vectors needs at least 4 vectors with their times");
    for (std::size_t i = 1; i < mTimes.size(); ++i)
        if (!(mTimes[i] > mTimes[i - 1])) throw std::invalid_argument("state vector times must increase");
}

CSimState CSimVectorOrbit::state(double theTime) const
{
    const int n = static_cast<int>(mTimes.size());
    const int w = std::min(n, 10);
    // The window of w vectors nearest in time, kept inside the table.
    const int aAfter = static_cast<int>(std::lower_bound(mTimes.begin(), mTimes.end(), theTime) - mTimes.begin());
    const int aFirst = std::clamp(aAfter - w / 2, 0, n - w);
    CSimState r;
    for (int i = aFirst; i < aFirst + w; ++i) {
        double l = 1.0;
        for (int j = aFirst; j < aFirst + w; ++j)
            if (j != i) l *= (theTime - mTimes[j]) / (mTimes[i] - mTimes[j]);
        r.mPos += mStates[i].mPos * l;
        r.mVel += mStates[i].mVel * l;
    }
    return r;
}

std::vector<CSimState> fqorvSimSampleOrbit(const CSimOrbit& theOrbit, double theFirst, double theStep, int theCount)
{
    std::vector<CSimState> aStates;
    aStates.reserve(theCount);
    for (int i = 0; i < theCount; ++i) aStates.push_back(theOrbit.state(theFirst + i * theStep));
    return aStates;
}
