// Perlin noise: hashed gradients at the integer lattice corners around a point, blended with the
// quintic fade. The order in which corners are blended follows the reference implementation
// (which differs between value-only and derivative evaluation in 4D) so results match to the bit.
#include "noise_perlin.h"

#include "noise_hash.h"

#include <OpenImageIO/fmath.h>

#include <cmath>
#include <type_traits>

namespace OSL::noise {

namespace {

using D2 = Dual2<float>;

inline float valueOf(float x) {
    return x;
}
inline float valueOf(const D2& x) {
    return x.val();
}

// Fractional part with the lattice cell; the slope of x passes through unchanged.
inline float fracOf(float x, int cell) {
    return x - float(cell);
}
inline D2 fracOf(const D2& x, int cell) {
    return D2(x.val() - float(cell), x.dx(), x.dy());
}

template <class T>
inline T fade(const T& t) {
    return t * t * t * (t * (t * T(6.0f) - T(15.0f)) + T(10.0f));
}

template <class T>
inline T blend(const T& a, const T& b, const T& t) {
    return a * (T(1.0f) - t) + b * t;
}

template <class T>
inline T flipIf(const T& v, bool flip) {
    return flip ? -v : v;
}

// Gradient dot products: the low bits of the corner hash pick one of a small set of gradient
// directions (unnormalised; the per-dimension scale below accounts for their length).
template <class T>
T gradDot(uint32_t hash, const T* f, int dims) {
    switch (dims) {
    case 1: {
        const int h = int(hash & 15);
        const float g = (h & 8) ? -float(1 + (h & 7)) : float(1 + (h & 7));
        return g * f[0];
    }
    case 2: {
        const int h = int(hash & 7);
        const T u = h < 4 ? f[0] : f[1];
        const T v = 2.0f * (h < 4 ? f[1] : f[0]);
        return flipIf(u, h & 1) + flipIf(v, h & 2);
    }
    case 3: {
        const int h = int(hash & 15);
        const T u = h < 8 ? f[0] : f[1];
        const T v = h < 4 ? f[1] : ((h == 12 || h == 14) ? f[0] : f[2]);
        return flipIf(u, h & 1) + flipIf(v, h & 2);
    }
    default: {
        const int h = int(hash & 31);
        const T u = h < 24 ? f[0] : f[1];
        const T v = h < 16 ? f[1] : f[2];
        const T s = h < 8 ? f[2] : f[3];
        return flipIf(u, h & 1) + flipIf(v, h & 2) + flipIf(s, h & 4);
    }
    }
}

inline int wrapIndex(int i, int period) {
    int r = i % period;
    if (r < 0) r += period;
    return r;
}

constexpr float kScale[4] = {0.2500f, 0.6616f, 0.9820f, 0.8344f};

// Axes in the order the corners are blended.
template <class T>
const int* blendOrder(int dims) {
    static constexpr int d1[] = {0}, d2[] = {0, 1}, d3[] = {2, 0, 1};
    static constexpr int d4Value[] = {2, 0, 1, 3}, d4Deriv[] = {3, 2, 0, 1};
    switch (dims) {
    case 1:
        return d1;
    case 2:
        return d2;
    case 3:
        return d3;
    default:
        return std::is_same_v<T, float> ? d4Value : d4Deriv;
    }
}

} // namespace

template <class T>
void perlin(T* out, int nchan, const T* x, int dims, const float* period) {
    int cell[4];
    T frac[4], weight[4];
    int wrap[4] = {0, 0, 0, 0};
    for (int d = 0; d < dims; ++d) {
        cell[d] = OIIO::ifloor(valueOf(x[d]));
        frac[d] = fracOf(x[d], cell[d]);
        weight[d] = fade(frac[d]);
        if (period) {
            const int p = OIIO::ifloor(period[d]);
            wrap[d] = p < 1 ? 1 : p;
        }
    }

    const int ncorners = 1 << dims;
    uint32_t hash[16];
    for (int c = 0; c < ncorners; ++c) {
        uint32_t key[4];
        for (int d = 0; d < dims; ++d) {
            const int i = cell[d] + ((c >> d) & 1);
            key[d] = uint32_t(period ? wrapIndex(i, wrap[d]) : i);
        }
        hash[c] = hashKeys(key, dims);
    }

    const int* order = blendOrder<T>(dims);
    for (int ch = 0; ch < nchan; ++ch) {
        T v[16];
        for (int c = 0; c < ncorners; ++c) {
            T offset[4];
            for (int d = 0; d < dims; ++d) offset[d] = ((c >> d) & 1) ? frac[d] - T(1.0f) : frac[d];
            const uint32_t h = nchan == 1 ? hash[c] : (hash[c] >> (8 * ch)) & 0xFFu;
            v[c] = gradDot(h, offset, dims);
        }
        int reduced = 0;
        for (int k = 0; k < dims; ++k) {
            const int axis = order[k];
            const int bit = 1 << axis;
            for (int c = 0; c < ncorners; ++c)
                if (!(c & (reduced | bit))) v[c] = blend(v[c], v[c | bit], weight[axis]);
            reduced |= bit;
        }
        out[ch] = kScale[dims - 1] * v[0];
    }
}

template void perlin<float>(float*, int, const float*, int, const float*);
template void perlin<D2>(D2*, int, const D2*, int, const float*);

} // namespace OSL::noise
