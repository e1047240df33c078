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

// The gradient selector of a lattice point. A float result uses the whole hash; channel c of a
// vector result uses byte c of it.
// A periodic noise wraps each lattice coordinate into [0, period); a period of 0 leaves the
// coordinate as it is.
int4 ksg_wrap_cell(int4 cell, int4 period) {
    int4 safe = max(period, 1);
    int4 r = cell % safe;
    r += (r < 0) ? safe : 0;
    return (period > 0) ? r : cell;
}

int ksg_lattice_hash(int4 cell, int n, int channel, int4 period) {
    uint h = ksg_hash_keys(asuint(ksg_wrap_cell(cell, period)), n);
    if (channel < 0)
        return (int)h;
    return (int)((h >> (8u * (uint)channel)) & 0xFFu);
}

float ksg_negate_if(float v, int condition) { return condition != 0 ? -v : v; }

float ksg_grad(int hash, float x) {
    int h = hash & 15;
    float g = 1.0 + (float)(h & 7);
    if ((h & 8) != 0)
        g = -g;
    return g * x;
}

float ksg_grad(int hash, float x, float y) {
    int h = hash & 7;
    float u = h < 4 ? x : y;
    float v = 2.0 * (h < 4 ? y : x);
    return ksg_negate_if(u, h & 1) + ksg_negate_if(v, h & 2);
}

float ksg_grad(int hash, float x, float y, float z) {
    int h = hash & 15;
    float u = h < 8 ? x : y;
    float v = h < 4 ? y : ((h == 12 || h == 14) ? x : z);
    return ksg_negate_if(u, h & 1) + ksg_negate_if(v, h & 2);
}

float ksg_grad(int hash, float x, float y, float z, float w) {
    int h = hash & 31;
    float u = h < 24 ? x : y;
    float v = h < 16 ? y : z;
    float s = h < 8 ? z : w;
    return ksg_negate_if(u, h & 1) + ksg_negate_if(v, h & 2) + ksg_negate_if(s, h & 4);
}

float ksg_fade(float t) { return t * t * t * (t * (t * 6.0 - 15.0) + 10.0); }

float ksg_lerp(float a, float b, float t) { return (1.0 - t) * a + t * b; }

float ksg_bilerp(float v0, float v1, float v2, float v3, float s, float t) {
    return ksg_lerp(ksg_lerp(v0, v1, s), ksg_lerp(v2, v3, s), t);
}

float ksg_perlin1(float x, int channel, int4 period) {
    int X = (int)floor(x);
    float fx = x - (float)X;
    float g0 = ksg_grad(ksg_lattice_hash(int4(X, 0, 0, 0), 1, channel, period), fx);
    float g1 = ksg_grad(ksg_lattice_hash(int4(X + 1, 0, 0, 0), 1, channel, period), fx - 1.0);
    return 0.25 * ksg_lerp(g0, g1, ksg_fade(fx));
}

float ksg_perlin2(float2 p, int channel, int4 period) {
    int2 c = (int2)floor(p);
    float2 f = p - (float2)c;
    float v[4];
    [unroll] for (int i = 0; i < 4; ++i) {
        int2 o = int2(i & 1, i >> 1);
        v[i] = ksg_grad(ksg_lattice_hash(int4(c + o, 0, 0), 2, channel, period), f.x - o.x, f.y - o.y);
    }
    return 0.6616 * ksg_bilerp(v[0], v[1], v[2], v[3], ksg_fade(f.x), ksg_fade(f.y));
}

// Trilinear blend of the gradients at the 8 corners of the cell of p (in the cube slice w).
float ksg_perlin_cube(int4 c, float4 f, int n, int channel, int4 period) {
    float v[8];
    [unroll] for (int i = 0; i < 8; ++i) {
        int3 o = int3(i & 1, (i >> 1) & 1, i >> 2);
        int4 corner = int4(c.xyz + o, c.w);
        float3 d = f.xyz - (float3)o;
        int h = ksg_lattice_hash(corner, n, channel, period);
        v[i] = n == 3 ? ksg_grad(h, d.x, d.y, d.z) : ksg_grad(h, d.x, d.y, d.z, f.w);
    }
    float s = ksg_fade(f.x), t = ksg_fade(f.y), r = ksg_fade(f.z);
    return ksg_lerp(ksg_bilerp(v[0], v[1], v[2], v[3], s, t),
                    ksg_bilerp(v[4], v[5], v[6], v[7], s, t), r);
}

float ksg_perlin3(float3 p, int channel, int4 period) {
    int4 c = int4((int3)floor(p), 0);
    float4 f = float4(p - (float3)c.xyz, 0.0);
    return 0.9820 * ksg_perlin_cube(c, f, 3, channel, period);
}

float ksg_perlin4(float4 p, int channel, int4 period) {
    int4 c = (int4)floor(p);
    float4 f = p - (float4)c;
    float near = ksg_perlin_cube(c, f, 4, channel, period);
    float far = ksg_perlin_cube(c + int4(0, 0, 0, 1), f - float4(0, 0, 0, 1), 4, channel, period);
    return 0.8344 * ksg_lerp(near, far, ksg_fade(f.w));
}

// Aperiodic noise wraps nothing.
static const int4 ksg_no_period = int4(0, 0, 0, 0);

float perlin_1_1(float1 p) { return ksg_perlin1(p.x, -1, ksg_no_period); }
float perlin_1_2(float2 p) { return ksg_perlin2(p, -1, ksg_no_period); }
float perlin_1_3(float3 p) { return ksg_perlin3(p, -1, ksg_no_period); }
float perlin_1_4(float4 p) { return ksg_perlin4(p, -1, ksg_no_period); }
float3 perlin_3_1(float1 p) {
    return float3(ksg_perlin1(p.x, 0, ksg_no_period), ksg_perlin1(p.x, 1, ksg_no_period),
                  ksg_perlin1(p.x, 2, ksg_no_period));
}
float3 perlin_3_2(float2 p) {
    return float3(ksg_perlin2(p, 0, ksg_no_period), ksg_perlin2(p, 1, ksg_no_period),
                  ksg_perlin2(p, 2, ksg_no_period));
}
float3 perlin_3_3(float3 p) {
    return float3(ksg_perlin3(p, 0, ksg_no_period), ksg_perlin3(p, 1, ksg_no_period),
                  ksg_perlin3(p, 2, ksg_no_period));
}
float3 perlin_3_4(float4 p) {
    return float3(ksg_perlin4(p, 0, ksg_no_period), ksg_perlin4(p, 1, ksg_no_period),
                  ksg_perlin4(p, 2, ksg_no_period));
}

// ---- Periodic noise (pnoise, psnoise): name_D_N(position, period) ----

// Integer periods, as the CPU shading system takes them: floored, at least 1.
int4 ksg_period(float4 period) { return max((int4)floor(period), 1); }

float pperlin_1_1(float1 p, float1 t) { return ksg_perlin1(p.x, -1, ksg_period(float4(t.x, 0, 0, 0))); }
float pperlin_1_2(float2 p, float2 t) { return ksg_perlin2(p, -1, ksg_period(float4(t, 0, 0))); }
float pperlin_1_3(float3 p, float3 t) { return ksg_perlin3(p, -1, ksg_period(float4(t, 0))); }
float pperlin_1_4(float4 p, float4 t) { return ksg_perlin4(p, -1, ksg_period(t)); }
float3 pperlin_3_1(float1 p, float1 t) {
    int4 w = ksg_period(float4(t.x, 0, 0, 0));
    return float3(ksg_perlin1(p.x, 0, w), ksg_perlin1(p.x, 1, w), ksg_perlin1(p.x, 2, w));
}
float3 pperlin_3_2(float2 p, float2 t) {
    int4 w = ksg_period(float4(t, 0, 0));
    return float3(ksg_perlin2(p, 0, w), ksg_perlin2(p, 1, w), ksg_perlin2(p, 2, w));
}
float3 pperlin_3_3(float3 p, float3 t) {
    int4 w = ksg_period(float4(t, 0));
    return float3(ksg_perlin3(p, 0, w), ksg_perlin3(p, 1, w), ksg_perlin3(p, 2, w));
}
float3 pperlin_3_4(float4 p, float4 t) {
    int4 w = ksg_period(t);
    return float3(ksg_perlin4(p, 0, w), ksg_perlin4(p, 1, w), ksg_perlin4(p, 2, w));
}

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
    float x0 = x - (float)i0;
    float x1 = x0 - 1.0;
    float t0 = 1.0 - x0 * x0;
    float t1 = 1.0 - x1 * x1;
    t0 *= t0;
    t1 *= t1;
    float n0 = t0 * t0 * ksg_simplex_grad1(i0, seed) * x0;
    float n1 = t1 * t1 * ksg_simplex_grad1(i0 + 1, seed) * x1;
    return 0.36 * (n0 + n1);
}

// The contribution of one simplex corner at offset d with gradient g.
float ksg_simplex_corner(float t, float gd) {
    if (t < 0.0)
        return 0.0;
    t *= t;
    return t * t * gd;
}

float ksg_simplex2(float2 p, int seed) {
    const float F2 = 0.366025403;
    const float G2 = 0.211324865;
    float s = (p.x + p.y) * F2;
    int i = (int)floor(p.x + s);
    int j = (int)floor(p.y + s);
    float t = (float)(i + j) * G2;
    float2 d0 = p - float2((float)i - t, (float)j - t);
    int2 o1 = d0.x > d0.y ? int2(1, 0) : int2(0, 1);
    float2 d1 = d0 - (float2)o1 + G2;
    float2 d2 = d0 - 1.0 + 2.0 * G2;
    float n = 0.0;
    float2 g0 = ksg_simplex_grad2[ksg_scramble(asuint(i), asuint(j), asuint(seed)) & 7u];
    n += ksg_simplex_corner(0.5 - dot(d0, d0), dot(g0, d0));
    float2 g1 = ksg_simplex_grad2[ksg_scramble(asuint(i + o1.x), asuint(j + o1.y), asuint(seed)) & 7u];
    n += ksg_simplex_corner(0.5 - dot(d1, d1), dot(g1, d1));
    float2 g2 = ksg_simplex_grad2[ksg_scramble(asuint(i + 1), asuint(j + 1), asuint(seed)) & 7u];
    n += ksg_simplex_corner(0.5 - dot(d2, d2), dot(g2, d2));
    return 64.0 * n;
}

float3 ksg_simplex_gradient3(int3 c, int seed) {
    uint inner = ksg_scramble(asuint(c.z), asuint(seed), 0u);
    return ksg_simplex_grad3[ksg_scramble(asuint(c.x), asuint(c.y), inner) & 15u];
}

float ksg_simplex3(float3 p, int seed) {
    const float F3 = 0.333333333;
    const float G3 = 0.166666667;
    float s = (p.x + p.y + p.z) * F3;
    int3 c = (int3)floor(p + s);
    float t = (float)(c.x + c.y + c.z) * G3;
    float3 d0 = p - ((float3)c - t);
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
    float3 d1 = d0 - (float3)o1 + G3;
    float3 d2 = d0 - (float3)o2 + 2.0 * G3;
    float3 d3 = d0 - 1.0 + 3.0 * G3;
    float n = 0.0;
    n += ksg_simplex_corner(0.5 - dot(d0, d0), dot(ksg_simplex_gradient3(c, seed), d0));
    n += ksg_simplex_corner(0.5 - dot(d1, d1), dot(ksg_simplex_gradient3(c + o1, seed), d1));
    n += ksg_simplex_corner(0.5 - dot(d2, d2), dot(ksg_simplex_gradient3(c + o2, seed), d2));
    n += ksg_simplex_corner(0.5 - dot(d3, d3), dot(ksg_simplex_gradient3(c + 1, seed), d3));
    return 68.0 * n;
}

float4 ksg_simplex_gradient4(int4 c, int seed) {
    uint inner = ksg_scramble(asuint(c.z), asuint(c.w), asuint(seed));
    return ksg_simplex_grad4(ksg_scramble(asuint(c.x), asuint(c.y), inner));
}

float ksg_simplex4(float4 p, int seed) {
    const float F4 = 0.309016994;
    const float G4 = 0.138196601;
    float s = (p.x + p.y + p.z + p.w) * F4;
    int4 c = (int4)floor(p + s);
    float t = (float)(c.x + c.y + c.z + c.w) * G4;
    float4 d0 = p - ((float4)c - t);
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
    float4 d1 = d0 - (float4)o1 + G4;
    float4 d2 = d0 - (float4)o2 + 2.0 * G4;
    float4 d3 = d0 - (float4)o3 + 3.0 * G4;
    float4 d4 = d0 - 1.0 + 4.0 * G4;
    float n = 0.0;
    n += ksg_simplex_corner(0.5 - dot(d0, d0), dot(ksg_simplex_gradient4(c, seed), d0));
    n += ksg_simplex_corner(0.5 - dot(d1, d1), dot(ksg_simplex_gradient4(c + o1, seed), d1));
    n += ksg_simplex_corner(0.5 - dot(d2, d2), dot(ksg_simplex_gradient4(c + o2, seed), d2));
    n += ksg_simplex_corner(0.5 - dot(d3, d3), dot(ksg_simplex_gradient4(c + o3, seed), d3));
    n += ksg_simplex_corner(0.5 - dot(d4, d4), dot(ksg_simplex_gradient4(c + 1, seed), d4));
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
