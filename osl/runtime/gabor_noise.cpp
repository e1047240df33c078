// Gabor noise evaluation: a Poisson-distributed set of random-phase Gabor kernels per grid cell,
// summed over the 27 cells around the point; when filtering, each kernel is sliced to the
// surface's tangent plane and convolved with the Gaussian footprint of the pixel.
#include "gabor_noise.h"

#include <Imath/ImathFun.h>
#include <OpenImageIO/fmath.h>
#include <OpenImageIO/hash.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdint>

namespace OSL {

namespace {

using D2 = Dual2<float>;

// A position with derivatives, one dual number per axis.
struct DPoint {
    D2 x, y, z;
};

constexpr float kFrequency = 2.0f;
constexpr float kImpulseWeight = 1.0f;
// Kernels count only where their Gaussian envelope is above this fraction of its peak.
constexpr float kTruncate = 0.02f;
// sqrt(pi / ln 2), as the float the noise's scale was tuned with.
constexpr float kSqrtPiOverLn2 = 2.128934e+00f;
constexpr float kPi = float(M_PI);
constexpr float kTwoPi = float(2.0 * M_PI);

// The random stream of one cell: a multiplicative congruential generator seeded with a hash of
// the cell's integer coordinates and the channel, so every evaluation near a cell replays the
// same impulses.
class CellRandom {
public:
    CellRandom(const Vec3& cell, int channel) {
        const uint32_t start = 0xdeadbeefu + (4u << 2) + 13u;
        uint32_t a = start + uint32_t(OIIO::ifloor(cell.x));
        uint32_t b = start + uint32_t(OIIO::ifloor(cell.y));
        uint32_t c = start + uint32_t(OIIO::ifloor(cell.z));
        OIIO::bjhash::bjmix(a, b, c);
        a += uint32_t(channel);
        m_state = OIIO::bjhash::bjfinal(a, b, c);
        if (m_state == 0) m_state = 1;
    }
    // Uniform in [0, 1].
    float next() {
        m_state *= 3039177861u;
        return float(m_state) / float(UINT_MAX);
    }
    // Poisson-distributed count with the given mean (Knuth's product of uniforms).
    int poisson(float mean) {
        const float limit = std::exp(-mean);
        int count = 0;
        float t = next();
        while (t > limit) {
            ++count;
            t *= next();
        }
        return count;
    }

private:
    uint32_t m_state;
};

struct GaborSetup {
    int anisotropic = 0;
    bool filter = true;
    Vec3 direction;
    float a = 1.0f; // the kernels' Gaussian width
    float radius = 1.0f, radius2 = 1.0f, radius3 = 1.0f, radiusInv = 1.0f;
    float lambda = 1.0f; // impulse density
    float sqrtLambdaInv = 1.0f;
    bool periodic = false;
    Vec3 period;
    // Filtering: the surface normal of the footprint, the footprint's covariance in tangent
    // space and the rotation from texture to tangent space.
    Vec3 normal;
    Matrix22 footprint;
    Matrix33 toTangent;
};

float det2(const Matrix22& m) {
    return m[0][0] * m[1][1] - m[0][1] * m[1][0];
}

// Row vector times matrix.
Vec2 mulRow(const Matrix22& m, const Vec2& v) {
    return Vec2(v.x * m[0][0] + v.y * m[1][0], v.x * m[0][1] + v.y * m[1][1]);
}
Vec3 mulRow(const Matrix33& m, const Vec3& v) {
    return Vec3(v.x * m[0][0] + v.y * m[1][0] + v.z * m[2][0],
                v.x * m[0][1] + v.y * m[1][1] + v.z * m[2][1],
                v.x * m[0][2] + v.y * m[1][2] + v.z * m[2][2]);
}
DPoint mulRow(const Matrix33& m, const DPoint& v) {
    DPoint r;
    r.x = v.x * m[0][0] + v.y * m[1][0] + v.z * m[2][0];
    r.y = v.x * m[0][1] + v.y * m[1][1] + v.z * m[2][1];
    r.z = v.x * m[0][2] + v.y * m[1][2] + v.z * m[2][2];
    return r;
}

GaborSetup makeSetup(const GaborOptions& opt) {
    GaborSetup s;
    s.anisotropic = opt.anisotropic;
    s.filter = opt.doFilter;
    s.direction = opt.direction;
    const float bandwidth = Imath::clamp(opt.bandwidth, 0.01f, 100.0f);
    const float twoToBandwidth = OIIO::fast_exp2(bandwidth);
    // Evaluated in double, then rounded, as the noise was originally tuned.
    s.a = float(kFrequency * ((twoToBandwidth - 1.0) / (twoToBandwidth + 1.0)) * kSqrtPiOverLn2);
    s.radius = std::sqrt(-std::log(kTruncate) / kPi) / s.a;
    s.radius2 = s.radius * s.radius;
    s.radius3 = s.radius2 * s.radius;
    s.radiusInv = 1.0f / s.radius;
    const float impulses = Imath::clamp(opt.impulses, 1.0f, 32.0f);
    s.lambda = impulses / (float(1.33333 * M_PI) * s.radius3);
    s.sqrtLambdaInv = 1.0f / std::sqrt(s.lambda);
    return s;
}

// Works out the pixel footprint in the tangent plane of the position's derivatives; turns
// filtering off where the footprint is degenerate (no derivatives, or too small to matter).
void setupFilter(const Dual2<Vec3>& p, GaborSetup& s) {
    Vec3 n = p.dx().cross(p.dy());
    if (n.dot(n) < 1.0e-6f) {
        s.filter = false;
        return;
    }
    n.normalize();
    Vec3 t = std::fabs(n.x) < 0.9f ? Vec3(0.0f, n.z, -n.y) : Vec3(-n.z, 0.0f, n.x);
    t.normalize();
    const Vec3 b = n.cross(t);
    // Columns t, b, n: texture to tangent space.
    const Matrix33 texToTan(t.x, b.x, n.x, t.y, b.y, n.y, t.z, b.z, n.z);
    const Vec3& dx = p.dx();
    const Vec3& dy = p.dy();
    const Matrix33 screenToTex(dx.x, dy.x, 0.0f, dx.y, dy.y, 0.0f, dx.z, dy.z, 0.0f);
    const Matrix33 screenToTan = screenToTex * texToTan;
    const Matrix22 m(screenToTan[0][0], screenToTan[0][1], screenToTan[1][0], screenToTan[1][1]);
    const float sigma = 0.5f;
    const Matrix22 sigmaScreen(sigma * sigma, 0.0f, 0.0f, sigma * sigma);
    const Matrix22 sigmaTan = m.transposed() * sigmaScreen * m;
    s.normal = n;
    s.footprint = sigmaTan;
    s.toTangent = texToTan;
    if (det2(sigmaTan) < 1.0e-18f) s.filter = false;
}

// weight * exp(-pi a^2 |x|^2) * cos(2 pi omega.x + phi), in three or two dimensions.
D2 kernel3(const D2& weight, const Vec3& omega, const D2& phi, float a, const DPoint& x) {
    const D2 xx = x.x * x.x + x.y * x.y + x.z * x.z;
    const D2 g = exp((-kPi * (a * a)) * xx);
    const D2 ox = omega.x * x.x + omega.y * x.y + omega.z * x.z;
    const D2 h = cos(kTwoPi * ox + phi);
    return weight * g * h;
}
D2 kernel2(const D2& weight, const Vec2& omega, const D2& phi, float a, const D2& x, const D2& y) {
    const D2 xx = x * x + y * y;
    const D2 g = exp((-kPi * (a * a)) * xx);
    const D2 ox = omega.x * x + omega.y * y;
    const D2 h = cos(kTwoPi * ox + phi);
    return weight * g * h;
}

// The frequency and phase of one impulse, drawn according to the anisotropy mode.
void sampleImpulse(const GaborSetup& s, CellRandom& rng, Vec3& omega, float& phi) {
    if (s.anisotropic == 1) {
        omega = s.direction;
    } else if (s.anisotropic == 0) {
        const float omegaT = kTwoPi * rng.next();
        const float cosP = OIIO::lerp(-1.0f, 1.0f, rng.next());
        const float sinP = std::sqrt(std::max(0.0f, 1.0f - cosP * cosP));
        float sinT, cosT;
        OIIO::fast_sincos(omegaT, &sinT, &cosT);
        omega = Vec3(cosT * sinP, sinT * sinP, cosP).normalized();
    } else {
        // Hybrid: the direction's length, at a random angle in the xy plane.
        const float r = s.direction.length();
        const float omegaT = kTwoPi * rng.next();
        float sinT, cosT;
        OIIO::fast_sincos(omegaT, &sinT, &cosT);
        omega = r * Vec3(cosT, sinT, 0.0f);
    }
    phi = kTwoPi * rng.next();
}

// Slices a 3D kernel at signed distance d from the tangent plane and convolves the 2D result
// with the footprint Gaussian; evaluates it at the tangent-plane position.
D2 filteredKernel(const GaborSetup& s, const Vec3& omega, float phi, const DPoint& xk) {
    const Vec3 omegaT = mulRow(s.toTangent, omega);
    const D2 d = -(s.normal.x * xk.x + s.normal.y * xk.y + s.normal.z * xk.z);
    const D2 wSlice = kImpulseWeight * exp((-kPi * (s.a * s.a)) * (d * d));
    const Vec2 omegaSlice(omegaT.x, omegaT.y);
    const D2 phiSlice = D2(phi) - (kTwoPi * d) * omegaT.z;

    const Matrix22& sigmaFootprint = s.footprint;
    const float g = s.a * s.a / kTwoPi;
    const Matrix22 sigmaG(g, 0.0f, 0.0f, g);
    const float cF = 1.0f / (kTwoPi * std::sqrt(det2(sigmaFootprint)));
    const Matrix22 sigmaF = float(1.0 / (4.0 * M_PI * M_PI)) * sigmaFootprint.inverse();
    const Matrix22 sigmaSum = sigmaG + sigmaF;
    const float cSum = 1.0f / (kTwoPi * std::sqrt(det2(sigmaSum)));
    const Vec2 muSum = mulRow(sigmaSum.inverse(), omegaSlice);
    const float envelope = std::exp(-0.5f * muSum.dot(omegaSlice));
    const D2 wFiltered = cF * wSlice * cSum * envelope;
    const Matrix22 sigmaGInv = sigmaG.inverse();
    const Matrix22 sigmaGF = (sigmaF.inverse() + sigmaGInv).inverse();
    const Vec2 omegaFiltered = mulRow(sigmaGF * sigmaGInv, omegaSlice);
    const float aFiltered = std::sqrt(float(2.0 * M_PI * double(std::sqrt(det2(sigmaGF)))));

    const DPoint xt = mulRow(s.toTangent, xk);
    return kernel2(wFiltered, omegaFiltered, phiSlice, aFiltered, xt.x, xt.y);
}

float wrapCoord(float v, float period) {
    period = std::floor(period);
    if (period < 1.0f) period = 1.0f;
    return v - period * std::floor(v / period);
}

// Sum of the impulses of one cell; xc is the evaluation point relative to the cell's corner.
D2 cellSum(const GaborSetup& s, const Vec3& cell, const DPoint& xc, int channel) {
    const Vec3 key = s.periodic ? Vec3(wrapCoord(cell.x, s.period.x), wrapCoord(cell.y, s.period.y),
                                       wrapCoord(cell.z, s.period.z))
                                : cell;
    CellRandom rng(key, channel);
    const int n = rng.poisson(s.lambda * s.radius3);
    D2 sum(0.0f);
    for (int i = 0; i < n; ++i) {
        // The impulse position within the cell, drawn z first.
        const float zr = rng.next();
        const float yr = rng.next();
        const float xr = rng.next();
        DPoint xk;
        xk.x = (xc.x - D2(xr)) * s.radius;
        xk.y = (xc.y - D2(yr)) * s.radius;
        xk.z = (xc.z - D2(zr)) * s.radius;
        Vec3 omega;
        float phi;
        sampleImpulse(s, rng, omega, phi);
        const float dist2 =
            xk.x.val() * xk.x.val() + xk.y.val() * xk.y.val() + xk.z.val() * xk.z.val();
        if (!(dist2 < s.radius2)) continue;
        if (!s.filter) {
            sum += kernel3(D2(kImpulseWeight), omega, D2(phi), s.a, xk);
            continue;
        }
        D2 k = filteredKernel(s, omega, phi, xk);
        // A numerically failed filter (a nearly singular footprint) falls back to the
        // unfiltered kernel.
        if (!std::isfinite(k.val())) k = kernel3(D2(kImpulseWeight), omega, D2(phi), s.a, xk);
        sum += k;
    }
    return sum;
}

D2 evaluate(const GaborSetup& s, const DPoint& x, int channel) {
    DPoint g;
    g.x = x.x * s.radiusInv;
    g.y = x.y * s.radiusInv;
    g.z = x.z * s.radiusInv;
    const Vec3 corner(std::floor(g.x.val()), std::floor(g.y.val()), std::floor(g.z.val()));
    D2 sum(0.0f);
    for (int k = -1; k <= 1; ++k)
        for (int j = -1; j <= 1; ++j)
            for (int i = -1; i <= 1; ++i) {
                DPoint xc;
                xc.x = (g.x - D2(corner.x)) - D2(float(i));
                xc.y = (g.y - D2(corner.y)) - D2(float(j));
                xc.z = (g.z - D2(corner.z)) - D2(float(k));
                sum += cellSum(s, corner + Vec3(float(i), float(j), float(k)), xc, channel);
            }
    return sum * s.sqrtLambdaInv;
}

} // namespace

void gaborNoise(const Dual2<Vec3>& p, const Vec3* period, const GaborOptions& opt, int channels,
                Dual2<float>* out) {
    GaborSetup s = makeSetup(opt);
    if (period) {
        s.periodic = true;
        s.period = *period;
    }
    if (s.filter) setupFilter(p, s);
    DPoint x;
    x.x = D2(p.val().x, p.dx().x, p.dy().x);
    x.y = D2(p.val().y, p.dx().y, p.dy().y);
    x.z = D2(p.val().z, p.dx().z, p.dy().z);
    // Scales the sum's standard deviation so that the noise mostly stays within [-1, 1].
    const float variance = 1.0f / (4.0f * std::sqrt(2.0f) * (s.a * s.a * s.a));
    const float scale = 0.5f * (1.0f / (3.0f * std::sqrt(variance)));
    for (int c = 0; c < channels; ++c) out[c] = evaluate(s, x, c) * scale;
}

} // namespace OSL
