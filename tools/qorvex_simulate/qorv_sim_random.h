// Random numbers of the simulator: counter-based seeding, so that every pulse, record and target
// draws from its own stream and the output does not depend on the number of threads.
#pragma once

#include <cmath>
#include <cstdint>

/// SplitMix64 step: a well-mixed 64-bit value of a 64-bit state.
inline uint64_t fqorvSimMix64(uint64_t theValue)
{
    uint64_t z = theValue + 0x9E3779B97F4A7C15ULL;
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ULL;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBULL;
    return z ^ (z >> 31);
}

/// xoshiro256** with Gaussian and uniform draws; seeded from (seed, stream, index).
class CSimRandom {
public:
    CSimRandom(uint64_t theSeed, uint64_t theStream, uint64_t theIndex)
    {
        uint64_t x = fqorvSimMix64(theSeed ^ fqorvSimMix64(theStream * 0xD1B54A32D192ED03ULL + theIndex));
        for (uint64_t& s : mState) {
            x = fqorvSimMix64(x);
            s = x;
        }
    }

    /// The next 64 random bits.
    uint64_t next()
    {
        const uint64_t r = rotl(mState[1] * 5, 7) * 9;
        const uint64_t t = mState[1] << 17;
        mState[2] ^= mState[0];
        mState[3] ^= mState[1];
        mState[1] ^= mState[2];
        mState[0] ^= mState[3];
        mState[2] ^= t;
        mState[3] = rotl(mState[3], 45);
        return r;
    }

    /// Uniform in [0, 1).
    double uniform() { return static_cast<double>(next() >> 11) * 0x1.0p-53; }

    /// Two independent standard normal values (Marsaglia's polar method).
    void gaussianPair(double& a, double& b)
    {
        double u, v, s;
        do {
            u = 2.0 * uniform() - 1.0;
            v = 2.0 * uniform() - 1.0;
            s = u * u + v * v;
        } while (s >= 1.0 || s == 0.0);
        const double f = std::sqrt(-2.0 * std::log(s) / s);
        a = u * f;
        b = v * f;
    }

    /// One standard normal value by the ziggurat method of Marsaglia and Tsang (128 layers), the
    /// layer taken from the low 7 bits and the value from the high 32 bits of one draw, so that the
    /// two are independent. About five times faster than the polar method.
    double gaussian();

private:
    static uint64_t rotl(uint64_t x, int k) { return (x << k) | (x >> (64 - k)); }
    uint64_t mState[4];
};

// Stream numbers of the random draws.
inline constexpr uint64_t CQORV_SIM_STREAM_NOISE = 1;
inline constexpr uint64_t CQORV_SIM_STREAM_PREFIX = 2;
inline constexpr uint64_t CQORV_SIM_STREAM_TARGETS = 3;
inline constexpr uint64_t CQORV_SIM_STREAM_SCATTERERS = 4;

namespace NQORV_SIM_ZIGGURAT {

/// Tables of the 128-layer ziggurat: layer bounds kn (scaled to 2^31), widths wn, densities fn.
struct CTables {
    uint32_t kn[128];
    double wn[128];
    double fn[128];
    CTables()
    {
        const double m1 = 2147483648.0;
        double dn = 3.442619855899, tn = dn;
        const double vn = 9.91256303526217e-3;
        const double q = vn / std::exp(-0.5 * dn * dn);
        kn[0] = static_cast<uint32_t>((dn / q) * m1);
        kn[1] = 0;
        wn[0] = q / m1;
        wn[127] = dn / m1;
        fn[0] = 1.0;
        fn[127] = std::exp(-0.5 * dn * dn);
        for (int i = 126; i >= 1; --i) {
            dn = std::sqrt(-2.0 * std::log(vn / dn + std::exp(-0.5 * dn * dn)));
            kn[i + 1] = static_cast<uint32_t>((dn / tn) * m1);
            tn = dn;
            fn[i] = std::exp(-0.5 * dn * dn);
            wn[i] = dn / m1;
        }
    }
};

inline const CTables& tables()
{
    static const CTables t;
    return t;
}

}  // namespace NQORV_SIM_ZIGGURAT

inline double CSimRandom::gaussian()
{
    const NQORV_SIM_ZIGGURAT::CTables& t = NQORV_SIM_ZIGGURAT::tables();
    constexpr double r = 3.442619855899;  // start of the tail
    for (;;) {
        const uint64_t u = next();
        const int iz = static_cast<int>(u & 127);
        const int32_t hz = static_cast<int32_t>(u >> 32);
        const uint32_t aHz = hz < 0 ? static_cast<uint32_t>(-static_cast<int64_t>(hz)) : static_cast<uint32_t>(hz);
        const double x = hz * t.wn[iz];
        if (aHz < t.kn[iz]) return x;  // inside the layer's rectangle: the common case
        if (iz == 0) {                 // the tail beyond r
            double xt, y;
            do {
                xt = -std::log(1.0 - uniform()) / r;
                y = -std::log(1.0 - uniform());
            } while (y + y < xt * xt);
            return hz > 0 ? r + xt : -r - xt;
        }
        // The wedge between the rectangle and the curve.
        if (t.fn[iz] + uniform() * (t.fn[iz - 1] - t.fn[iz]) < std::exp(-0.5 * x * x)) return x;
    }
}
