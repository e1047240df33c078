// Simplex noise (after Gustavson's sdnoise1234) with corners hashed instead of permuted. The
// skew constants, gradient sets, falloff and scales, and the order of every sum, follow the
// reference shading language so that values agree with it.
#include "noise_simplex.h"

#include <OpenImageIO/fmath.h>
#include <OpenImageIO/hash.h>

#include <cstdint>

namespace OSL::noise {

namespace {

inline uint32_t scramble(uint32_t a, uint32_t b = 0, uint32_t c = 0) {
    return OIIO::bjhash::bjfinal(a, b, c ^ 0xdeadbeefu);
}

// Gradient directions: 2D a fixed set of eight, 3D the twelve cube edge midpoints padded to
// sixteen, 4D the 32 tesseract edge directions.
constexpr float kGrad2[8][2] = {{-1, -1}, {1, 0},  {-1, 0}, {1, 1},
                                {-1, 1},  {0, -1}, {0, 1},  {1, -1}};
constexpr float kGrad3[16][3] = {{1, 0, 1},  {0, 1, 1},  {-1, 0, 1},  {0, -1, 1},
                                 {1, 0, -1}, {0, 1, -1}, {-1, 0, -1}, {0, -1, -1},
                                 {1, -1, 0}, {1, 1, 0},  {-1, 1, 0},  {-1, -1, 0},
                                 {1, 0, 1},  {-1, 0, 1}, {0, 1, -1},  {0, -1, -1}};

// Tesseract edge e has a zero on axis e/8; the other three axes, in order, are negative where
// bits 2, 1, 0 of e are set.
struct Grad4Table {
    float g[32][4];
    constexpr Grad4Table() : g{} {
        for (int e = 0; e < 32; ++e) {
            const int zero = e >> 3;
            int bit = 2;
            for (int a = 0; a < 4; ++a) {
                if (a == zero) {
                    g[e][a] = 0.0f;
                } else {
                    g[e][a] = ((e >> bit) & 1) ? -1.0f : 1.0f;
                    --bit;
                }
            }
        }
    }
};
constexpr Grad4Table kGrad4;

constexpr float kZero[4] = {0, 0, 0, 0};

const float* cornerGradient(const int* cell, int dims, int seed) {
    const uint32_t s = uint32_t(seed);
    switch (dims) {
    case 2:
        return kGrad2[scramble(uint32_t(cell[0]), uint32_t(cell[1]), s) & 7];
    case 3:
        return kGrad3[scramble(uint32_t(cell[0]), uint32_t(cell[1]),
                               scramble(uint32_t(cell[2]), s)) &
                      15];
    default:
        return kGrad4.g[scramble(uint32_t(cell[0]), uint32_t(cell[1]),
                                 scramble(uint32_t(cell[2]), uint32_t(cell[3]), s)) &
                        31];
    }
}

float simplex1(float x, int seed, float* gradient) {
    const int i0 = OIIO::ifloor(x);
    const float x0 = x - float(i0);
    const float x1 = x0 - 1.0f;
    auto slope = [seed](int i) {
        const uint32_t h = scramble(uint32_t(i), uint32_t(seed));
        const float g = 1.0f + float(h & 7);
        return (h & 8) ? -g : g;
    };
    const float x20 = x0 * x0, t0 = 1.0f - x20, t20 = t0 * t0, t40 = t20 * t20;
    const float g0 = slope(i0);
    const float n0 = t40 * g0 * x0;
    const float x21 = x1 * x1, t1 = 1.0f - x21, t21 = t1 * t1, t41 = t21 * t21;
    const float g1 = slope(i0 + 1);
    const float n1 = t41 * g1 * x1;
    const float scale = 0.36f;
    if (gradient) {
        float d = t20 * t0 * g0 * x20;
        d += t21 * t1 * g1 * x21;
        d *= -8.0f;
        d += t40 * g0 + t41 * g1;
        gradient[0] = d * scale;
    }
    return scale * (n0 + n1);
}

struct SimplexDims {
    float skew, unskew, scale;
    bool tiesGoFirst; // whether an equal coordinate counts as the larger one
};

// 2 to 4 dimensions share one shape: skew to find the cell, rank the offsets to walk the
// simplex corners from the cell origin, and sum the corners' radial falloff times gradient.
float simplexN(const float* x, int dims, int seed, float* gradient) {
    static const SimplexDims kDims[3] = {
        {0.366025403f, 0.211324865f, 64.0f, false},
        {0.333333333f, 0.166666667f, 68.0f, true},
        {0.309016994f, 0.138196601f, 54.0f, false},
    };
    const SimplexDims& k = kDims[dims - 2];

    float sum = x[0];
    for (int a = 1; a < dims; ++a) sum = sum + x[a];
    const float s = sum * k.skew;
    int cell[4], cellSum = 0;
    for (int a = 0; a < dims; ++a) {
        cell[a] = OIIO::ifloor(x[a] + s);
        cellSum += cell[a];
    }
    const float t = float(cellSum) * k.unskew;
    float off[5][4]; // offsets of the point from each simplex corner
    for (int a = 0; a < dims; ++a) off[0][a] = x[a] - (float(cell[a]) - t);

    // rank[a]: how many other axes have a smaller offset than axis a.
    int rank[4] = {0, 0, 0, 0};
    for (int a = 0; a < dims; ++a)
        for (int b = a + 1; b < dims; ++b) {
            const bool aFirst = k.tiesGoFirst ? off[0][a] >= off[0][b] : off[0][a] > off[0][b];
            ++rank[aFirst ? a : b];
        }

    int step[5][4];
    for (int a = 0; a < dims; ++a) {
        step[0][a] = 0;
        step[dims][a] = 1;
        for (int c = 1; c < dims; ++c) step[c][a] = rank[a] >= dims - c ? 1 : 0;
    }
    for (int c = 1; c <= dims; ++c)
        for (int a = 0; a < dims; ++a)
            off[c][a] = (off[0][a] - float(step[c][a])) + float(c) * k.unskew;

    float t2[5] = {}, t4[5] = {}, tc[5] = {}, n[5] = {};
    const float* g[5];
    for (int c = 0; c <= dims; ++c) {
        float tt = 0.5f;
        for (int a = 0; a < dims; ++a) tt = tt - off[c][a] * off[c][a];
        tc[c] = tt;
        t2[c] = t4[c] = n[c] = 0.0f;
        g[c] = kZero;
        if (tt >= 0.0f) {
            int corner[4];
            for (int a = 0; a < dims; ++a) corner[a] = cell[a] + step[c][a];
            g[c] = cornerGradient(corner, dims, seed);
            t2[c] = tt * tt;
            t4[c] = t2[c] * t2[c];
            float dot = g[c][0] * off[c][0];
            for (int a = 1; a < dims; ++a) dot = dot + g[c][a] * off[c][a];
            n[c] = t4[c] * dot;
        }
    }
    float total = n[0];
    for (int c = 1; c <= dims; ++c) total = total + n[c];

    if (gradient) {
        float d[4];
        for (int c = 0; c <= dims; ++c) {
            float dot = g[c][0] * off[c][0];
            for (int a = 1; a < dims; ++a) dot = dot + g[c][a] * off[c][a];
            const float temp = t2[c] * tc[c] * dot;
            for (int a = 0; a < dims; ++a)
                d[a] = c == 0 ? temp * off[c][a] : d[a] + temp * off[c][a];
        }
        for (int a = 0; a < dims; ++a) {
            float lin = t4[0] * g[0][a];
            for (int c = 1; c <= dims; ++c) lin = lin + t4[c] * g[c][a];
            gradient[a] = ((d[a] * -8.0f) + lin) * k.scale;
        }
    }
    return k.scale * total;
}

} // namespace

float simplex(const float* x, int dims, int seed, float* gradient) {
    return dims == 1 ? simplex1(x[0], seed, gradient) : simplexN(x, dims, seed, gradient);
}

} // namespace OSL::noise
