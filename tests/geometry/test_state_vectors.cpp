// State-vector orbits against the simulator's exact Kepler orbit and scene truth: interpolation at
// the spacings of leaders and precise orbit files, propagation of one vector, and the zero-Doppler
// geometry of a scene.
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <vector>

#include <gtest/gtest.h>

#include "geometry_test_util.h"
#include "qorv_sim_geometry.h"
#include "qorv_sim_truth.h"
#include "qorv_state_vectors.h"
#include "qorvex_test_support.h"

namespace {

std::vector<CStateVector> vectorsOf(double theFirst, double theStep, const std::vector<CSimState>& theStates)
{
    std::vector<CStateVector> v(theStates.size());
    for (std::size_t i = 0; i < v.size(); ++i) {
        const CSimState& s = theStates[i];
        v[i] = {theFirst + i * theStep, {s.mPos.x, s.mPos.y, s.mPos.z}, {s.mVel.x, s.mVel.y, s.mVel.z}};
    }
    return v;
}

CSimVec3 vec(const double* theV) { return {theV[0], theV[1], theV[2]}; }

TEST(StateVectorOrbit, InterpolatesTheKeplerOrbitAtLeaderAndOrbitFileSpacings)
{
    const CSimKeplerOrbit aTruth(CSimKepler{});
    for (const double aStep : {4.2, 60.0}) {
        const CStateVectorOrbit aOrbit(vectorsOf(-5.0 * aStep, aStep, fqorvSimSampleOrbit(aTruth, -5.0 * aStep, aStep, 11)));
        double aPos = 0.0, aVel = 0.0, aAcc = 0.0;
        for (double t = aOrbit.firstTime(); t <= aOrbit.lastTime(); t += aStep / 7.3) {
            const COrbitState s = aOrbit.at(t);
            const CSimState e = aTruth.state(t);
            const CSimVec3 a = (aTruth.state(t + 0.05).mVel - aTruth.state(t - 0.05).mVel) / 0.1;
            aPos = std::max(aPos, (vec(s.mPosition) - e.mPos).norm());
            aVel = std::max(aVel, (vec(s.mVelocity) - e.mVel).norm());
            aAcc = std::max(aAcc, (vec(s.mAcceleration) - a).norm());
        }
        EXPECT_LT(aPos, 1e-3) << aStep;
        EXPECT_LT(aVel, 1e-4) << aStep;
        EXPECT_LT(aAcc, 1e-5) << aStep;
        std::printf("spacing %.1f s: position %.0e m, velocity %.0e m/s, acceleration %.0e m/s2\n", aStep, aPos, aVel,
                    aAcc);
    }
}

TEST(StateVectorOrbit, PropagatesOneVector)
{
    const CSimKeplerOrbit aTruth(CSimKepler{});
    const CStateVector aStart = vectorsOf(0.0, 0.0, {aTruth.state(0.0)})[0];
    const std::vector<double> aTimes = {60.0, -10.0, 0.0, -60.0, 10.0, 33.3};  // either side, any order

    // The central field alone is the Kepler orbit.
    const std::vector<CStateVector> aKepler = fqorvPropagateStateVector(aStart, aTimes, 0.0);
    ASSERT_EQ(aKepler.size(), aTimes.size());
    for (std::size_t i = 0; i < aTimes.size(); ++i) {
        EXPECT_EQ(aKepler[i].mTime, aTimes[i]);
        EXPECT_LT((vec(aKepler[i].mPosition) - aTruth.state(aTimes[i]).mPos).norm(), 1e-3) << aTimes[i];
        EXPECT_LT((vec(aKepler[i].mVelocity) - aTruth.state(aTimes[i]).mVel).norm(), 1e-4) << aTimes[i];
    }

    // Over seconds J2 moves the orbit off the Kepler one by half its acceleration times t^2.
    const std::vector<CStateVector> aJ2 = fqorvPropagateStateVector(aStart, aTimes);
    const CSimVec3 r = aTruth.state(0.0).mPos;
    const double z2 = r.z * r.z / r.dot(r);
    const double k = -1.5 * CQORV_WGS84_J2 * CQORV_WGS84_GM * 6378137.0 * 6378137.0 / std::pow(r.norm(), 5);
    const CSimVec3 aJ2Acceleration(k * (1.0 - 5.0 * z2) * r.x, k * (1.0 - 5.0 * z2) * r.y, k * (3.0 - 5.0 * z2) * r.z);
    for (std::size_t i = 0; i < aTimes.size(); ++i) {
        const CSimVec3 d = vec(aJ2[i].mPosition) - aTruth.state(aTimes[i]).mPos;
        const CSimVec3 aExpected = aJ2Acceleration * (0.5 * aTimes[i] * aTimes[i]);
        if (std::fabs(aTimes[i]) <= 10.0) {
            EXPECT_LE((d - aExpected).norm(), 0.02 * aExpected.norm() + 1e-6) << aTimes[i];
        }
    }
}

TEST(StateVectorOrbit, ZeroDopplerGeometryLandsOnTheSimulatedTargets)
{
    qtest::InProcessEnvironment aEnv;  // the simulated headers read the key files
    for (const CSimProductHeader& p : {CSimProductHeader("ers2", 2000, 1024), CSimProductHeader("alos", 2000, 1024)}) {
        SCOPED_TRACE(p.mScene.mPreset);
        const CSimSceneTruth r = fqorvSimComputeTruth(p.mScene, *p.mOrbit, *p.mTimeline);
        const CSimStateVectors v = fqorvSimStateVectors(p.mScene, *p.mOrbit, *p.mTimeline, 4.2);
        const CStateVectorOrbit aOrbit(vectorsOf(v.mFirst, v.mStep, v.mStates));
        const int aSide = p.mScene.mLookSign;

        for (const CSimTargetTruth& t : r.mTargets) {
            CZeroDopplerPoint z;
            ASSERT_TRUE(fqorvZeroDopplerPoint(aOrbit, t.mZeroDopplerTime, t.mSlantRange, t.mHeight, aSide, z));
            EXPECT_LT((vec(z.mTarget) - t.mTarget->mEcef).norm(), 1e-3);
            EXPECT_NEAR(fqorvEffectiveVelocity(aOrbit, t.mZeroDopplerTime, t.mSlantRange, t.mHeight, aSide),
                        t.mVrZeroDoppler, 0.01);
        }
        CZeroDopplerPoint z;
        ASSERT_TRUE(fqorvZeroDopplerPoint(aOrbit, r.mCentreZeroDopplerTime, r.mCentreRange, r.mCentreHeight, aSide, z));
        EXPECT_NEAR(z.mLatitudeDeg, r.mCentreLat, 1e-8);
        EXPECT_NEAR(z.mLongitudeDeg, r.mCentreLon, 1e-8);
        EXPECT_NEAR(z.mIncidenceDeg, r.mIncidenceDeg, 1e-6);
        EXPECT_NEAR(z.mLookDeg, r.mLookAngleDeg, 1e-6);
        EXPECT_NEAR(z.mHeadingDeg, r.mHeadingDeg, 1e-6);
        const double aVr = fqorvEffectiveVelocity(aOrbit, r.mCentreZeroDopplerTime, r.mCentreRange, r.mCentreHeight, aSide);
        EXPECT_NEAR(aVr, r.mVrZeroDoppler, 0.01);
        std::printf("%s centre: %.0e m off, effective velocity %.0e m/s off\n", p.mScene.mPreset.c_str(),
                    (vec(z.mTarget) - r.mCentre).norm(), aVr - r.mVrZeroDoppler);

        // The other side of the track, and a range that ends above the ground.
        ASSERT_TRUE(fqorvZeroDopplerPoint(aOrbit, r.mCentreZeroDopplerTime, r.mCentreRange, r.mCentreHeight, -aSide, z));
        EXPECT_EQ(fqorvSimLookSide(p.mOrbit->state(r.mCentreZeroDopplerTime), vec(z.mTarget)), -aSide);
        EXPECT_NEAR(z.mIncidenceDeg, r.mIncidenceDeg, 0.5);
        EXPECT_FALSE(fqorvZeroDopplerPoint(aOrbit, r.mCentreZeroDopplerTime, 500e3, 0.0, aSide, z));
        EXPECT_TRUE(std::isnan(fqorvEffectiveVelocity(aOrbit, r.mCentreZeroDopplerTime, 500e3, 0.0, aSide)));
    }
}

}  // namespace
