// Integer hashing behind every lattice noise: Bob Jenkins' lookup3 over a handful of 32-bit keys,
// and the mapping of hash bits to [0,1]. The results must equal the reference shading language
// bit for bit, so the seeding and the order in which keys enter the mix are fixed.
#pragma once

#include <OpenImageIO/hash.h>

#include <cstdint>
#include <cstring>
#include <limits>

namespace OSL::noise {

// lookup3 of n keys (n >= 1): three keys per mixing round, the rest folded into the final mix.
inline uint32_t hashKeys(const uint32_t* k, int n) {
    uint32_t a, b, c;
    a = b = c = 0xdeadbeefu + (uint32_t(n) << 2) + 13u;
    while (n > 3) {
        a += k[0];
        b += k[1];
        c += k[2];
        OIIO::bjhash::bjmix(a, b, c);
        n -= 3;
        k += 3;
    }
    switch (n) {
    case 3:
        c += k[2];
        [[fallthrough]];
    case 2:
        b += k[1];
        [[fallthrough]];
    case 1:
        a += k[0];
        c = OIIO::bjhash::bjfinal(a, b, c);
        break;
    default:
        break;
    }
    return c;
}

// Maps all 32 bits onto [0,1] (dividing by 2^32-1, in float as the reference does).
inline float bitsTo01(uint32_t bits) {
    constexpr float scale =
        static_cast<float>(1.0 / static_cast<double>(std::numeric_limits<uint32_t>::max()));
    return float(bits) * scale;
}

inline uint32_t floatBits(float f) {
    uint32_t u;
    std::memcpy(&u, &f, sizeof u);
    return u;
}

} // namespace OSL::noise
