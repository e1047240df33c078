// Viewport versions of OSL's noises: cell, hash, Perlin and simplex noise over 1 to 4
// dimensions, with float (_1_N) and vector (_3_N) results. They use the CPU shading system's
// hashes (Bob Jenkins' lookup3), gradients and scale factors, so the viewport shows the same
// pattern as the render.

uint ksg_rotl32(uint x, uint k) { return (x << k) | (x >> (32u - k)); }

void ksg_bjmix(inout uint a, inout uint b, inout uint c) {
    a -= c; a ^= ksg_rotl32(c, 4u);  c += b;
    b -= a; b ^= ksg_rotl32(a, 6u);  a += c;
    c -= b; c ^= ksg_rotl32(b, 8u);  b += a;
    a -= c; a ^= ksg_rotl32(c, 16u); c += b;
    b -= a; b ^= ksg_rotl32(a, 19u); a += c;
    c -= b; c ^= ksg_rotl32(b, 4u);  b += a;
}

uint ksg_bjfinal(uint a, uint b, uint c) {
    c ^= b; c -= ksg_rotl32(b, 14u);
    a ^= c; a -= ksg_rotl32(c, 11u);
    b ^= a; b -= ksg_rotl32(a, 25u);
    c ^= b; c -= ksg_rotl32(b, 16u);
    a ^= c; a -= ksg_rotl32(c, 4u);
    b ^= a; b -= ksg_rotl32(a, 14u);
    c ^= b; c -= ksg_rotl32(b, 24u);
    return c;
}

// lookup3 over N 32-bit keys; its initial value is 0xdeadbeef + 4 N + 13.
uint ksg_inthash(uint k0) {
    uint s = 0xdeadbeefu + 17u;
    return ksg_bjfinal(s + k0, s, s);
}

uint ksg_inthash(uint k0, uint k1) {
    uint s = 0xdeadbeefu + 21u;
    return ksg_bjfinal(s + k0, s + k1, s);
}

uint ksg_inthash(uint k0, uint k1, uint k2) {
    uint s = 0xdeadbeefu + 25u;
    return ksg_bjfinal(s + k0, s + k1, s + k2);
}

uint ksg_inthash(uint k0, uint k1, uint k2, uint k3) {
    uint s = 0xdeadbeefu + 29u;
    uint a = s + k0, b = s + k1, c = s + k2;
    ksg_bjmix(a, b, c);
    return ksg_bjfinal(a + k3, b, c);
}

uint ksg_inthash(uint k0, uint k1, uint k2, uint k3, uint k4) {
    uint s = 0xdeadbeefu + 33u;
    uint a = s + k0, b = s + k1, c = s + k2;
    ksg_bjmix(a, b, c);
    return ksg_bjfinal(a + k3, b + k4, c);
}

// The hash of the first n keys.
uint ksg_hash_keys(uint4 k, int n) {
    if (n == 1)
        return ksg_inthash(k.x);
    if (n == 2)
        return ksg_inthash(k.x, k.y);
    if (n == 3)
        return ksg_inthash(k.x, k.y, k.z);
    return ksg_inthash(k.x, k.y, k.z, k.w);
}

// The hash of the first n keys followed by one more (a result channel).
uint ksg_hash_keys(uint4 k, int n, uint extra) {
    if (n == 1)
        return ksg_inthash(k.x, extra);
    if (n == 2)
        return ksg_inthash(k.x, k.y, extra);
    if (n == 3)
        return ksg_inthash(k.x, k.y, k.z, extra);
    return ksg_inthash(k.x, k.y, k.z, k.w, extra);
}

// A 32-bit hash as a float in [0,1].
float ksg_bits_to_01(uint bits) { return (float)bits * 2.32830644e-10; }

// Cell noise hashes the integer cell of a point, hash noise the bits of its coordinates.
uint4 ksg_cell_keys(float4 p) { return asuint((int4)floor(p)); }
uint4 ksg_hash_keys_of(float4 p) { return asuint(p); }

float ksg_hash_float(uint4 keys, int n) { return ksg_bits_to_01(ksg_hash_keys(keys, n)); }

float3 ksg_hash_vector(uint4 keys, int n) {
    return float3(ksg_bits_to_01(ksg_hash_keys(keys, n, 0u)),
                  ksg_bits_to_01(ksg_hash_keys(keys, n, 1u)),
                  ksg_bits_to_01(ksg_hash_keys(keys, n, 2u)));
}

float cellnoise_1_1(float1 p) { return ksg_hash_float(ksg_cell_keys(float4(p.x, 0, 0, 0)), 1); }
float cellnoise_1_2(float2 p) { return ksg_hash_float(ksg_cell_keys(float4(p, 0, 0)), 2); }
float cellnoise_1_3(float3 p) { return ksg_hash_float(ksg_cell_keys(float4(p, 0)), 3); }
float cellnoise_1_4(float4 p) { return ksg_hash_float(ksg_cell_keys(p), 4); }
float3 cellnoise_3_1(float1 p) { return ksg_hash_vector(ksg_cell_keys(float4(p.x, 0, 0, 0)), 1); }
float3 cellnoise_3_2(float2 p) { return ksg_hash_vector(ksg_cell_keys(float4(p, 0, 0)), 2); }
float3 cellnoise_3_3(float3 p) { return ksg_hash_vector(ksg_cell_keys(float4(p, 0)), 3); }
float3 cellnoise_3_4(float4 p) { return ksg_hash_vector(ksg_cell_keys(p), 4); }

float hashnoise_1_1(float1 p) { return ksg_hash_float(ksg_hash_keys_of(float4(p.x, 0, 0, 0)), 1); }
float hashnoise_1_2(float2 p) { return ksg_hash_float(ksg_hash_keys_of(float4(p, 0, 0)), 2); }
float hashnoise_1_3(float3 p) { return ksg_hash_float(ksg_hash_keys_of(float4(p, 0)), 3); }
float hashnoise_1_4(float4 p) { return ksg_hash_float(ksg_hash_keys_of(p), 4); }
float3 hashnoise_3_1(float1 p) { return ksg_hash_vector(ksg_hash_keys_of(float4(p.x, 0, 0, 0)), 1); }
float3 hashnoise_3_2(float2 p) { return ksg_hash_vector(ksg_hash_keys_of(float4(p, 0, 0)), 2); }
float3 hashnoise_3_3(float3 p) { return ksg_hash_vector(ksg_hash_keys_of(float4(p, 0)), 3); }
float3 hashnoise_3_4(float4 p) { return ksg_hash_vector(ksg_hash_keys_of(p), 4); }

// ---- Perlin (gradient) noise, signed, range about [-1,1] ----

// A periodic noise wraps each lattice coordinate into [0, period); a period of 0 leaves the
// coordinate as it is.
int4 ksg_wrap_cell(int4 cell, int4 period) {
    int4 safe = max(period, 1);
    int4 r = cell % safe;
    r += (r < 0) ? safe : 0;
    return (period > 0) ? r : cell;
}

float ksg_negate_if(float v, int condition) { return condition != 0 ? -v : v; }

// The gradient of a lattice corner dotted with the offset d from it, in n dimensions. A float
// result uses the whole corner hash; channel c of a vector result uses byte c of it.
float ksg_grad(uint hash, float4 d, int n) {
    if (n == 1) {
        int h = (int)(hash & 15u);
        float g = 1.0 + (float)(h & 7);
        return ((h & 8) != 0 ? -g : g) * d.x;
    }
    if (n == 2) {
        int h = (int)(hash & 7u);
        float u = h < 4 ? d.x : d.y;
        float v = 2.0 * (h < 4 ? d.y : d.x);
        return ksg_negate_if(u, h & 1) + ksg_negate_if(v, h & 2);
    }
    if (n == 3) {
        int h = (int)(hash & 15u);
        float u = h < 8 ? d.x : d.y;
        float v = h < 4 ? d.y : ((h == 12 || h == 14) ? d.x : d.z);
        return ksg_negate_if(u, h & 1) + ksg_negate_if(v, h & 2);
    }
    int h = (int)(hash & 31u);
    float u = h < 24 ? d.x : d.y;
    float v = h < 16 ? d.y : d.z;
    float s = h < 8 ? d.z : d.w;
    return ksg_negate_if(u, h & 1) + ksg_negate_if(v, h & 2) + ksg_negate_if(s, h & 4);
}

float ksg_fade(float t) { return t * t * t * (t * (t * 6.0 - 15.0) + 10.0); }

// Written out rather than lerp(), whose rounding the device chooses.
float ksg_blend(float a, float b, float t) { return a * (1.0 - t) + b * t; }

// The corners of the cell around p and their hashes, hashed once for all channels.
struct ksg_PerlinCell {
    float4 frac;
    float4 weight;
    uint hash[16];
};

ksg_PerlinCell ksg_perlin_cell(float4 p, int n, int4 period) {
    ksg_PerlinCell cell;
    int4 c = (int4)floor(p);
    cell.frac = p - (float4)c;
    cell.weight = float4(ksg_fade(cell.frac.x), ksg_fade(cell.frac.y), ksg_fade(cell.frac.z),
                         ksg_fade(cell.frac.w));
    [unroll] for (int i = 0; i < 16; ++i) {
        int4 corner = ksg_wrap_cell(c + int4(i & 1, (i >> 1) & 1, (i >> 2) & 1, i >> 3), period);
        cell.hash[i] = i < (1 << n) ? ksg_hash_keys(asuint(corner), n) : 0u;
    }
    return cell;
}

// One channel (-1: the float result) of the noise of a cell. The corners are blended one axis
// at a time in the CPU shading system's order (z, x, y, then w from three dimensions up) so
// that the sums round alike.
float ksg_perlin_channel(ksg_PerlinCell cell, int n, int channel) {
    float v[16];
    [unroll] for (int i = 0; i < 16; ++i) {
        uint h = channel < 0 ? cell.hash[i] : (cell.hash[i] >> (8u * (uint)channel)) & 0xFFu;
        float4 offset = cell.frac - float4(i & 1, (i >> 1) & 1, (i >> 2) & 1, i >> 3);
        v[i] = i < (1 << n) ? ksg_grad(h, offset, n) : 0.0;
    }
    static const int order[4][4] = {{0, 0, 0, 0}, {0, 1, 0, 0}, {2, 0, 1, 0}, {2, 0, 1, 3}};
    int reduced = 0;
    [unroll] for (int k = 0; k < 4; ++k) {
        if (k < n) {
            int axis = order[n - 1][k];
            int bit = 1 << axis;
            [unroll] for (int i = 0; i < 16; ++i)
                if ((i & (reduced | bit)) == 0)
                    v[i] = ksg_blend(v[i], v[i | bit], cell.weight[axis]);
            reduced |= bit;
        }
    }
    static const float scale[4] = {0.2500, 0.6616, 0.9820, 0.8344};
    return scale[n - 1] * v[0];
}

float ksg_perlin(float4 p, int n, int4 period) {
    return ksg_perlin_channel(ksg_perlin_cell(p, n, period), n, -1);
}

float3 ksg_perlin3(float4 p, int n, int4 period) {
    ksg_PerlinCell cell = ksg_perlin_cell(p, n, period);
    return float3(ksg_perlin_channel(cell, n, 0), ksg_perlin_channel(cell, n, 1),
                  ksg_perlin_channel(cell, n, 2));
}

// Aperiodic noise wraps nothing.
static const int4 ksg_no_period = int4(0, 0, 0, 0);

float perlin_1_1(float1 p) { return ksg_perlin(float4(p.x, 0, 0, 0), 1, ksg_no_period); }
float perlin_1_2(float2 p) { return ksg_perlin(float4(p, 0, 0), 2, ksg_no_period); }
float perlin_1_3(float3 p) { return ksg_perlin(float4(p, 0), 3, ksg_no_period); }
float perlin_1_4(float4 p) { return ksg_perlin(p, 4, ksg_no_period); }
float3 perlin_3_1(float1 p) { return ksg_perlin3(float4(p.x, 0, 0, 0), 1, ksg_no_period); }
float3 perlin_3_2(float2 p) { return ksg_perlin3(float4(p, 0, 0), 2, ksg_no_period); }
float3 perlin_3_3(float3 p) { return ksg_perlin3(float4(p, 0), 3, ksg_no_period); }
float3 perlin_3_4(float4 p) { return ksg_perlin3(p, 4, ksg_no_period); }

// ---- Periodic noise (pnoise, psnoise): name_D_N(position, period) ----

// Integer periods, as the CPU shading system takes them: floored, at least 1.
int4 ksg_period(float4 period) { return max((int4)floor(period), 1); }

float pperlin_1_1(float1 p, float1 t) { return ksg_perlin(float4(p.x, 0, 0, 0), 1, ksg_period(float4(t.x, 1, 1, 1))); }
float pperlin_1_2(float2 p, float2 t) { return ksg_perlin(float4(p, 0, 0), 2, ksg_period(float4(t, 1, 1))); }
float pperlin_1_3(float3 p, float3 t) { return ksg_perlin(float4(p, 0), 3, ksg_period(float4(t, 1))); }
float pperlin_1_4(float4 p, float4 t) { return ksg_perlin(p, 4, ksg_period(t)); }
float3 pperlin_3_1(float1 p, float1 t) { return ksg_perlin3(float4(p.x, 0, 0, 0), 1, ksg_period(float4(t.x, 1, 1, 1))); }
float3 pperlin_3_2(float2 p, float2 t) { return ksg_perlin3(float4(p, 0, 0), 2, ksg_period(float4(t, 1, 1))); }
float3 pperlin_3_3(float3 p, float3 t) { return ksg_perlin3(float4(p, 0), 3, ksg_period(float4(t, 1))); }
float3 pperlin_3_4(float4 p, float4 t) { return ksg_perlin3(p, 4, ksg_period(t)); }

// Periodic cell and hash noise wrap the coordinates themselves into [0, period).
float4 ksg_wrap_coord(float4 p, float4 period) {
    float4 t = max(floor(period), 1.0);
    return p - t * floor(p / t);
}

float pcellnoise_1_1(float1 p, float1 t) { return cellnoise_1_1(ksg_wrap_coord(float4(p.x, 0, 0, 0), float4(t.x, 1, 1, 1)).x); }
float pcellnoise_1_2(float2 p, float2 t) { return cellnoise_1_2(ksg_wrap_coord(float4(p, 0, 0), float4(t, 1, 1)).xy); }
float pcellnoise_1_3(float3 p, float3 t) { return cellnoise_1_3(ksg_wrap_coord(float4(p, 0), float4(t, 1)).xyz); }
float pcellnoise_1_4(float4 p, float4 t) { return cellnoise_1_4(ksg_wrap_coord(p, t)); }
float3 pcellnoise_3_1(float1 p, float1 t) { return cellnoise_3_1(ksg_wrap_coord(float4(p.x, 0, 0, 0), float4(t.x, 1, 1, 1)).x); }
float3 pcellnoise_3_2(float2 p, float2 t) { return cellnoise_3_2(ksg_wrap_coord(float4(p, 0, 0), float4(t, 1, 1)).xy); }
float3 pcellnoise_3_3(float3 p, float3 t) { return cellnoise_3_3(ksg_wrap_coord(float4(p, 0), float4(t, 1)).xyz); }
float3 pcellnoise_3_4(float4 p, float4 t) { return cellnoise_3_4(ksg_wrap_coord(p, t)); }

float phashnoise_1_1(float1 p, float1 t) { return hashnoise_1_1(ksg_wrap_coord(float4(p.x, 0, 0, 0), float4(t.x, 1, 1, 1)).x); }
float phashnoise_1_2(float2 p, float2 t) { return hashnoise_1_2(ksg_wrap_coord(float4(p, 0, 0), float4(t, 1, 1)).xy); }
float phashnoise_1_3(float3 p, float3 t) { return hashnoise_1_3(ksg_wrap_coord(float4(p, 0), float4(t, 1)).xyz); }
float phashnoise_1_4(float4 p, float4 t) { return hashnoise_1_4(ksg_wrap_coord(p, t)); }
float3 phashnoise_3_1(float1 p, float1 t) { return hashnoise_3_1(ksg_wrap_coord(float4(p.x, 0, 0, 0), float4(t.x, 1, 1, 1)).x); }
float3 phashnoise_3_2(float2 p, float2 t) { return hashnoise_3_2(ksg_wrap_coord(float4(p, 0, 0), float4(t, 1, 1)).xy); }
float3 phashnoise_3_3(float3 p, float3 t) { return hashnoise_3_3(ksg_wrap_coord(float4(p, 0), float4(t, 1)).xyz); }
float3 phashnoise_3_4(float4 p, float4 t) { return hashnoise_3_4(ksg_wrap_coord(p, t)); }

// ---- Simplex noise, signed; a vector result uses seeds seed, seed + 1 and seed + 2 ----

uint ksg_scramble(uint v0, uint v1, uint v2) { return ksg_bjfinal(v0, v1, v2 ^ 0xdeadbeefu); }

static const float2 ksg_simplex_grad2[8] = {
    float2(-1, -1), float2(1, 0), float2(-1, 0), float2(1, 1),
    float2(-1, 1),  float2(0, -1), float2(0, 1), float2(1, -1)};

// The midpoints of the 12 cube edges, four of them repeated to make 16.
static const float3 ksg_simplex_grad3[16] = {
    float3(1, 0, 1),  float3(0, 1, 1),  float3(-1, 0, 1),  float3(0, -1, 1),
    float3(1, 0, -1), float3(0, 1, -1), float3(-1, 0, -1), float3(0, -1, -1),
    float3(1, -1, 0), float3(1, 1, 0),  float3(-1, 1, 0),  float3(-1, -1, 0),
    float3(1, 0, 1),  float3(-1, 0, 1), float3(0, 1, -1),  float3(0, -1, -1)};

// The 32 edges of the tesseract: one zero coordinate (entries 8k.. have coordinate k zero), the
// other three +-1 in binary order of their signs.
float4 ksg_simplex_grad4(uint h) {
    uint index = h & 31u;
    uint zero = index >> 3;
    float3 signs = float3((index & 4u) != 0 ? -1.0 : 1.0, (index & 2u) != 0 ? -1.0 : 1.0,
                          (index & 1u) != 0 ? -1.0 : 1.0);
    if (zero == 0u)
        return float4(0.0, signs);
    if (zero == 1u)
        return float4(signs.x, 0.0, signs.yz);
    if (zero == 2u)
        return float4(signs.xy, 0.0, signs.z);
    return float4(signs, 0.0);
}

float ksg_simplex_grad1(int i, int seed) {
    uint h = ksg_scramble(asuint(i), asuint(seed), 0u);
    float g = 1.0 + (float)(h & 7u);
    return (h & 8u) != 0u ? -g : g;
}

float ksg_simplex1(float x, int seed) {
    int i0 = (int)floor(x);
    precise float x0 = x - (float)i0;
    precise float x1 = x0 - 1.0;
    precise float t0 = 1.0 - x0 * x0;
    precise float t1 = 1.0 - x1 * x1;
    t0 *= t0;
    t1 *= t1;
    precise float n0 = t0 * t0 * ksg_simplex_grad1(i0, seed) * x0;
    precise float n1 = t1 * t1 * ksg_simplex_grad1(i0 + 1, seed) * x1;
    precise float n = 0.36 * (n0 + n1);
    return n;
}

// The contribution of one simplex corner at offset d with gradient g: (0.5 - |d|^2)^4 (g . d)
// where positive. The squares are subtracted and the products added one at a time, in the CPU
// shading system's order, rather than through dot(), whose rounding the device chooses.
float ksg_simplex_corner(float2 g, float2 d) {
    precise float t = (0.5 - d.x * d.x) - d.y * d.y;
    if (t < 0.0)
        return 0.0;
    t *= t;
    precise float n = t * t * (g.x * d.x + g.y * d.y);
    return n;
}

float ksg_simplex_corner(float3 g, float3 d) {
    precise float t = ((0.5 - d.x * d.x) - d.y * d.y) - d.z * d.z;
    if (t < 0.0)
        return 0.0;
    t *= t;
    precise float n = t * t * ((g.x * d.x + g.y * d.y) + g.z * d.z);
    return n;
}

float ksg_simplex_corner(float4 g, float4 d) {
    precise float t = (((0.5 - d.x * d.x) - d.y * d.y) - d.z * d.z) - d.w * d.w;
    if (t < 0.0)
        return 0.0;
    t *= t;
    precise float n = t * t * (((g.x * d.x + g.y * d.y) + g.z * d.z) + g.w * d.w);
    return n;
}

float ksg_simplex2(float2 p, int seed) {
    const float F2 = 0.366025403;
    const float G2 = 0.211324865;
    precise float s = (p.x + p.y) * F2;
    int i = (int)floor(p.x + s);
    int j = (int)floor(p.y + s);
    precise float t = (float)(i + j) * G2;
    precise float2 d0 = p - float2((float)i - t, (float)j - t);
    int2 o1 = d0.x > d0.y ? int2(1, 0) : int2(0, 1);
    precise float2 d1 = d0 - (float2)o1 + G2;
    precise float2 d2 = d0 - 1.0 + 2.0 * G2;
    float2 g0 = ksg_simplex_grad2[ksg_scramble(asuint(i), asuint(j), asuint(seed)) & 7u];
    float2 g1 = ksg_simplex_grad2[ksg_scramble(asuint(i + o1.x), asuint(j + o1.y), asuint(seed)) & 7u];
    float2 g2 = ksg_simplex_grad2[ksg_scramble(asuint(i + 1), asuint(j + 1), asuint(seed)) & 7u];
    float n = ksg_simplex_corner(g0, d0);
    n += ksg_simplex_corner(g1, d1);
    n += ksg_simplex_corner(g2, d2);
    return 64.0 * n;
}

float3 ksg_simplex_gradient3(int3 c, int seed) {
    uint inner = ksg_scramble(asuint(c.z), asuint(seed), 0u);
    return ksg_simplex_grad3[ksg_scramble(asuint(c.x), asuint(c.y), inner) & 15u];
}

float ksg_simplex3(float3 p, int seed) {
    const float F3 = 0.333333333;
    const float G3 = 0.166666667;
    precise float s = (p.x + p.y + p.z) * F3;
    int3 c = (int3)floor(p + s);
    precise float t = (float)(c.x + c.y + c.z) * G3;
    precise float3 d0 = p - ((float3)c - t);
    // The simplex of the cell that holds p follows the order of the offset's components.
    int3 o1, o2;
    if (d0.x >= d0.y) {
        if (d0.y >= d0.z) {
            o1 = int3(1, 0, 0); o2 = int3(1, 1, 0);
        } else if (d0.x >= d0.z) {
            o1 = int3(1, 0, 0); o2 = int3(1, 0, 1);
        } else {
            o1 = int3(0, 0, 1); o2 = int3(1, 0, 1);
        }
    } else {
        if (d0.y < d0.z) {
            o1 = int3(0, 0, 1); o2 = int3(0, 1, 1);
        } else if (d0.x < d0.z) {
            o1 = int3(0, 1, 0); o2 = int3(0, 1, 1);
        } else {
            o1 = int3(0, 1, 0); o2 = int3(1, 1, 0);
        }
    }
    precise float3 d1 = d0 - (float3)o1 + G3;
    precise float3 d2 = d0 - (float3)o2 + 2.0 * G3;
    precise float3 d3 = d0 - 1.0 + 0.5; // + 3 G3, which rounds to 0.5 in float
    float n = ksg_simplex_corner(ksg_simplex_gradient3(c, seed), d0);
    n += ksg_simplex_corner(ksg_simplex_gradient3(c + o1, seed), d1);
    n += ksg_simplex_corner(ksg_simplex_gradient3(c + o2, seed), d2);
    n += ksg_simplex_corner(ksg_simplex_gradient3(c + 1, seed), d3);
    return 68.0 * n;
}

float4 ksg_simplex_gradient4(int4 c, int seed) {
    uint inner = ksg_scramble(asuint(c.z), asuint(c.w), asuint(seed));
    return ksg_simplex_grad4(ksg_scramble(asuint(c.x), asuint(c.y), inner));
}

float ksg_simplex4(float4 p, int seed) {
    const float F4 = 0.309016994;
    const float G4 = 0.138196601;
    precise float s = (p.x + p.y + p.z + p.w) * F4;
    int4 c = (int4)floor(p + s);
    precise float t = (float)(c.x + c.y + c.z + c.w) * G4;
    precise float4 d0 = p - ((float4)c - t);
    // Rank of each offset component among the four (ties go to the later component); the
    // corners of the simplex step along the components from the largest rank down.
    int4 rank = int4(0, 0, 0, 0);
    if (d0.x > d0.y) rank.x++; else rank.y++;
    if (d0.x > d0.z) rank.x++; else rank.z++;
    if (d0.x > d0.w) rank.x++; else rank.w++;
    if (d0.y > d0.z) rank.y++; else rank.z++;
    if (d0.y > d0.w) rank.y++; else rank.w++;
    if (d0.z > d0.w) rank.z++; else rank.w++;
    int4 o1 = (int4)(rank >= 3);
    int4 o2 = (int4)(rank >= 2);
    int4 o3 = (int4)(rank >= 1);
    precise float4 d1 = d0 - (float4)o1 + G4;
    precise float4 d2 = d0 - (float4)o2 + 2.0 * G4;
    // 3 G4 rounded in float, as the CPU computes it (a compiler folding 3.0 * G4 in double
    // would round it one step higher).
    precise float4 d3 = d0 - (float4)o3 + asfloat(0x3ed4451eu);
    precise float4 d4 = d0 - 1.0 + 4.0 * G4;
    float n = ksg_simplex_corner(ksg_simplex_gradient4(c, seed), d0);
    n += ksg_simplex_corner(ksg_simplex_gradient4(c + o1, seed), d1);
    n += ksg_simplex_corner(ksg_simplex_gradient4(c + o2, seed), d2);
    n += ksg_simplex_corner(ksg_simplex_gradient4(c + o3, seed), d3);
    n += ksg_simplex_corner(ksg_simplex_gradient4(c + 1, seed), d4);
    return 54.0 * n;
}

float simplexnoise_1_1(float1 p, int seed) { return ksg_simplex1(p.x, seed); }
float simplexnoise_1_2(float2 p, int seed) { return ksg_simplex2(p, seed); }
float simplexnoise_1_3(float3 p, int seed) { return ksg_simplex3(p, seed); }
float simplexnoise_1_4(float4 p, int seed) { return ksg_simplex4(p, seed); }
float3 simplexnoise_3_1(float1 p, int seed) {
    return float3(ksg_simplex1(p.x, seed), ksg_simplex1(p.x, seed + 1), ksg_simplex1(p.x, seed + 2));
}
float3 simplexnoise_3_2(float2 p, int seed) {
    return float3(ksg_simplex2(p, seed), ksg_simplex2(p, seed + 1), ksg_simplex2(p, seed + 2));
}
float3 simplexnoise_3_3(float3 p, int seed) {
    return float3(ksg_simplex3(p, seed), ksg_simplex3(p, seed + 1), ksg_simplex3(p, seed + 2));
}
float3 simplexnoise_3_4(float4 p, int seed) {
    return float3(ksg_simplex4(p, seed), ksg_simplex4(p, seed + 1), ksg_simplex4(p, seed + 2));
}
