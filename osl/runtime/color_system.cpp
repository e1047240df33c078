// Colour systems: primaries to XYZ matrices, luminance weights, the blackbody table, spectral
// colours and the conversions between the built-in colour spaces, with derivatives.
#include "color_system.h"

#include <OpenImageIO/fmath.h>

#include <array>
#include <cmath>
#include <memory>

namespace OSL {

namespace {

using D2 = Dual2<float>;

// ---- scalar helpers shared by the plain and derivative-carrying conversions ---------------------

inline float val(float x) {
    return x;
}
inline float val(const D2& x) {
    return x.val();
}
inline float floorOf(float x) {
    return std::floor(x);
}
inline D2 floorOf(const D2& x) {
    return D2(std::floor(x.val()));
}
// x^p that answers 0 where the power is undefined or x is 0, as the shading library's pow does.
inline float powSafe(float x, float p) {
    if (x == 0.0f) return 0.0f;
    if (x < 0.0f && p != std::floor(p)) return 0.0f;
    return std::pow(x, p);
}
inline D2 powSafe(const D2& x, float p) {
    const float v = powSafe(x.val(), p);
    const float d = x.val() == 0.0f ? 0.0f : p * powSafe(x.val(), p - 1.0f);
    return D2(v, d * x.dx(), d * x.dy());
}
template <class S>
inline S minOf(const S& a, const S& b) {
    return val(b) < val(a) ? b : a;
}
template <class S>
inline S maxOf(const S& a, const S& b) {
    return val(a) < val(b) ? b : a;
}

template <class S>
struct Tri {
    S x, y, z;
};

template <class S>
Tri<S> mulRow(const Tri<S>& c, const Matrix33& m) {
    return {c.x * S(m[0][0]) + c.y * S(m[1][0]) + c.z * S(m[2][0]),
            c.x * S(m[0][1]) + c.y * S(m[1][1]) + c.z * S(m[2][1]),
            c.x * S(m[0][2]) + c.y * S(m[1][2]) + c.z * S(m[2][2])};
}

Tri<float> toTri(const Vec3& v) {
    return {v.x, v.y, v.z};
}
Vec3 fromTri(const Tri<float>& t) {
    return Vec3(t.x, t.y, t.z);
}
Tri<D2> toTri(const DColor& v) {
    return {D2(v.val().x, v.dx().x, v.dy().x), D2(v.val().y, v.dx().y, v.dy().y),
            D2(v.val().z, v.dx().z, v.dy().z)};
}
DColor fromTri(const Tri<D2>& t) {
    return DColor(Vec3(t.x.val(), t.y.val(), t.z.val()), Vec3(t.x.dx(), t.y.dx(), t.z.dx()),
                  Vec3(t.x.dy(), t.y.dy(), t.z.dy()));
}

// ---- the built-in spaces (Foley & van Dam for hsv/hsl; NTSC YIQ; CIE xyY; sRGB's curve) ---------

template <class S>
Tri<S> hsvToRgb(const Tri<S>& hsv) {
    const S& v = hsv.z;
    const S& s = hsv.y;
    if (val(s) < 0.0001f) return {v, v, v};
    const S h = S(6.0f) * (hsv.x - floorOf(hsv.x));
    const int sector = int(std::floor(val(h)));
    const S f = h - S(float(sector));
    const S p = v * (S(1.0f) - s);
    const S q = v * (S(1.0f) - s * f);
    const S t = v * (S(1.0f) - s * (S(1.0f) - f));
    switch (sector) {
    case 0:
        return {v, t, p};
    case 1:
        return {q, v, p};
    case 2:
        return {p, v, t};
    case 3:
        return {p, q, v};
    case 4:
        return {t, p, v};
    default:
        return {v, p, q};
    }
}

template <class S>
Tri<S> rgbToHsv(const Tri<S>& rgb) {
    const S lo = minOf(rgb.x, minOf(rgb.y, rgb.z));
    const S hi = maxOf(rgb.x, maxOf(rgb.y, rgb.z));
    const S chroma = hi - lo;
    S s(0.0f), h(0.0f);
    if (val(hi) > 0.0f) s = chroma / hi;
    if (val(s) > 0.0f) {
        // The hue's sector offset and the 1/6 scale are folded into one division.
        float base;
        S a, b;
        if (val(rgb.x) >= val(hi))
            base = 0.0f, a = rgb.y, b = rgb.z;
        else if (val(rgb.y) >= val(hi))
            base = 2.0f / 6.0f, a = rgb.z, b = rgb.x;
        else
            base = 4.0f / 6.0f, a = rgb.x, b = rgb.y;
        h = S(base) + (a - b) / (S(6.0f) * chroma);
        if (val(h) < 0.0f) h = h + S(1.0f);
    }
    return {h, s, hi};
}

template <class S>
Tri<S> hslToRgb(const Tri<S>& hsl) {
    const S& h = hsl.x;
    const S& s = hsl.y;
    const S& l = hsl.z;
    const S v = val(l) <= 0.5f ? l * (S(1.0f) + s) : l * (S(1.0f) - s) + s;
    if (val(v) <= 0.0f) return {S(0.0f), S(0.0f), S(0.0f)};
    const S lo = S(2.0f) * l - v;
    return hsvToRgb<S>({h, (v - lo) / v, v});
}

template <class S>
Tri<S> rgbToHsl(const Tri<S>& rgb) {
    const S lo = minOf(rgb.x, minOf(rgb.y, rgb.z));
    const Tri<S> hsv = rgbToHsv(rgb);
    const S& hi = hsv.z;
    const S l = (lo + hi) / S(2.0f);
    S s(0.0f);
    if (val(lo) != val(hi)) {
        const S spread = hi - lo;
        s = spread / (val(l) <= 0.5f ? hi + lo : S(2.0f) - hi - lo);
    }
    return {hsv.x, s, l};
}

const Matrix33 kYiqToRgb(1.0f, 1.0f, 1.0f, 0.9557f, -0.2716f, -1.1082f, 0.6199f, -0.6469f, 1.7051f);
const Matrix33 kRgbToYiq(0.299f, 0.596f, 0.212f, 0.587f, -0.275f, -0.523f, 0.114f, -0.321f, 0.311f);

template <class S>
Tri<S> xyzToXyY(const Tri<S>& xyz) {
    const S sum = xyz.x + xyz.y + xyz.z;
    const S inv = val(sum) >= 1.0e-6f ? S(1.0f) / sum : S(0.0f);
    return {xyz.x * inv, xyz.y * inv, xyz.y};
}
template <class S>
Tri<S> xyYToXyz(const Tri<S>& xyY) {
    const S& Y = xyY.z;
    const S scale = val(xyY.y) > 1.0e-6f ? Y / xyY.y : S(0.0f);
    return {scale * xyY.x, Y, scale * (S(1.0f) - xyY.x - xyY.y)};
}

template <class S>
S srgbToLinear1(const S& x) {
    return val(x) <= 0.04045f ? x * S(1.0f / 12.92f)
                              : powSafe((x + S(0.055f)) * S(1.0f / 1.055f), 2.4f);
}
template <class S>
S linearToSrgb1(const S& x) {
    return val(x) <= 0.0031308f ? S(12.92f) * x : S(1.055f) * powSafe(x, 1.0f / 2.4f) - S(0.055f);
}

// ---- spectra ----------------------------------------------------------------------------------

// CIE 1931 colour matching functions x̄, ȳ, z̄ from 380 to 780 nm in 5 nm steps.
constexpr float kCieMatch[81][3] = {
    {0.0014f, 0.0000f, 0.0065f}, {0.0022f, 0.0001f, 0.0105f}, {0.0042f, 0.0001f, 0.0201f},
    {0.0076f, 0.0002f, 0.0362f}, {0.0143f, 0.0004f, 0.0679f}, {0.0232f, 0.0006f, 0.1102f},
    {0.0435f, 0.0012f, 0.2074f}, {0.0776f, 0.0022f, 0.3713f}, {0.1344f, 0.0040f, 0.6456f},
    {0.2148f, 0.0073f, 1.0391f}, {0.2839f, 0.0116f, 1.3856f}, {0.3285f, 0.0168f, 1.6230f},
    {0.3483f, 0.0230f, 1.7471f}, {0.3481f, 0.0298f, 1.7826f}, {0.3362f, 0.0380f, 1.7721f},
    {0.3187f, 0.0480f, 1.7441f}, {0.2908f, 0.0600f, 1.6692f}, {0.2511f, 0.0739f, 1.5281f},
    {0.1954f, 0.0910f, 1.2876f}, {0.1421f, 0.1126f, 1.0419f}, {0.0956f, 0.1390f, 0.8130f},
    {0.0580f, 0.1693f, 0.6162f}, {0.0320f, 0.2080f, 0.4652f}, {0.0147f, 0.2586f, 0.3533f},
    {0.0049f, 0.3230f, 0.2720f}, {0.0024f, 0.4073f, 0.2123f}, {0.0093f, 0.5030f, 0.1582f},
    {0.0291f, 0.6082f, 0.1117f}, {0.0633f, 0.7100f, 0.0782f}, {0.1096f, 0.7932f, 0.0573f},
    {0.1655f, 0.8620f, 0.0422f}, {0.2257f, 0.9149f, 0.0298f}, {0.2904f, 0.9540f, 0.0203f},
    {0.3597f, 0.9803f, 0.0134f}, {0.4334f, 0.9950f, 0.0087f}, {0.5121f, 1.0000f, 0.0057f},
    {0.5945f, 0.9950f, 0.0039f}, {0.6784f, 0.9786f, 0.0027f}, {0.7621f, 0.9520f, 0.0021f},
    {0.8425f, 0.9154f, 0.0018f}, {0.9163f, 0.8700f, 0.0017f}, {0.9786f, 0.8163f, 0.0014f},
    {1.0263f, 0.7570f, 0.0011f}, {1.0567f, 0.6949f, 0.0010f}, {1.0622f, 0.6310f, 0.0008f},
    {1.0456f, 0.5668f, 0.0006f}, {1.0026f, 0.5030f, 0.0003f}, {0.9384f, 0.4412f, 0.0002f},
    {0.8544f, 0.3810f, 0.0002f}, {0.7514f, 0.3210f, 0.0001f}, {0.6424f, 0.2650f, 0.0000f},
    {0.5419f, 0.2170f, 0.0000f}, {0.4479f, 0.1750f, 0.0000f}, {0.3608f, 0.1382f, 0.0000f},
    {0.2835f, 0.1070f, 0.0000f}, {0.2187f, 0.0816f, 0.0000f}, {0.1649f, 0.0610f, 0.0000f},
    {0.1212f, 0.0446f, 0.0000f}, {0.0874f, 0.0320f, 0.0000f}, {0.0636f, 0.0232f, 0.0000f},
    {0.0468f, 0.0170f, 0.0000f}, {0.0329f, 0.0119f, 0.0000f}, {0.0227f, 0.0082f, 0.0000f},
    {0.0158f, 0.0057f, 0.0000f}, {0.0114f, 0.0041f, 0.0000f}, {0.0081f, 0.0029f, 0.0000f},
    {0.0058f, 0.0021f, 0.0000f}, {0.0041f, 0.0015f, 0.0000f}, {0.0029f, 0.0010f, 0.0000f},
    {0.0020f, 0.0007f, 0.0000f}, {0.0014f, 0.0005f, 0.0000f}, {0.0010f, 0.0004f, 0.0000f},
    {0.0007f, 0.0002f, 0.0000f}, {0.0005f, 0.0002f, 0.0000f}, {0.0003f, 0.0001f, 0.0000f},
    {0.0002f, 0.0001f, 0.0000f}, {0.0002f, 0.0001f, 0.0000f}, {0.0001f, 0.0000f, 0.0000f},
    {0.0001f, 0.0000f, 0.0000f}, {0.0001f, 0.0000f, 0.0000f}, {0.0000f, 0.0000f, 0.0000f}};

// Planck's law: spectral exitance (W/m^2 per metre of wavelength) of a black body.
float planck(float nm, float kelvin) {
    const float m = nm * 1e-9f;
    const float c1 = 3.74183e-16f; // 2 pi h c^2
    const float c2 = 1.4388e-2f;   // h c / k
    const float m2 = m * m;
    const float m5 = m2 * m2 * m;
    return (c1 * (1.0f / m5)) / OIIO::fast_expm1(c2 / (m * kelvin));
}

Vec3 blackbodyXyz(float kelvin) {
    const float step = float(5.0 * 1e-9); // the 5 nm integration step, in metres
    float X = 0.0f, Y = 0.0f, Z = 0.0f;
    for (int i = 0; i < 81; ++i) {
        const float e = planck(380.0f + 5.0f * float(i), kelvin) * step;
        X += e * kCieMatch[i][0];
        Y += e * kCieMatch[i][1];
        Z += e * kCieMatch[i][2];
    }
    return Vec3(X, Y, Z);
}

void clampZero(Vec3& c) {
    c.x = std::max(c.x, 0.0f);
    c.y = std::max(c.y, 0.0f);
    c.z = std::max(c.z, 0.0f);
}

// The blackbody table covers [800K, 12000K]; entry i sits at T = 2 i^1.5 + 800 so that entries are
// dense where the colour changes fastest, and holds the colour's fifth root, which interpolates
// nearly linearly.
constexpr float kDraper = 800.0f;
constexpr float kTableMax = 12000.0f;
constexpr int kTableSize = 317;
inline float tableTemperature(float i) {
    const float r = std::sqrt(i);
    return r * r * r * 2.0f + kDraper;
}
inline float tableIndex(float kelvin) {
    const float c = OIIO::fast_cbrt((kelvin - kDraper) / 2.0f);
    return c * c;
}

// ---- the named systems ------------------------------------------------------------------------

constexpr float kD65x = 0.3127f, kD65y = 0.3291f;
constexpr float kCx = 0.3101f, kCy = 0.3162f;
constexpr float kEx = 0.33333333f, kEy = 0.33333333f;
constexpr float kAcesX = 0.32168f, kAcesY = 0.33767f;

struct NamedChroma {
    const char* name;
    ColorSystem::Chroma chroma;
};
constexpr NamedChroma kSystems[] = {
    {"Rec709", {0.64f, 0.33f, 0.30f, 0.60f, 0.15f, 0.06f, kD65x, kD65y}},
    {"sRGB", {0.64f, 0.33f, 0.30f, 0.60f, 0.15f, 0.06f, kD65x, kD65y}},
    {"NTSC", {0.67f, 0.33f, 0.21f, 0.71f, 0.14f, 0.08f, kCx, kCy}},
    {"EBU", {0.64f, 0.33f, 0.29f, 0.60f, 0.15f, 0.06f, kD65x, kD65y}},
    {"PAL", {0.64f, 0.33f, 0.29f, 0.60f, 0.15f, 0.06f, kD65x, kD65y}},
    {"SECAM", {0.64f, 0.33f, 0.29f, 0.60f, 0.15f, 0.06f, kD65x, kD65y}},
    {"SMPTE", {0.630f, 0.340f, 0.310f, 0.595f, 0.155f, 0.070f, kD65x, kD65y}},
    {"HDTV", {0.670f, 0.330f, 0.210f, 0.710f, 0.150f, 0.060f, kD65x, kD65y}},
    {"CIE", {0.7355f, 0.2645f, 0.2658f, 0.7243f, 0.1669f, 0.0085f, kEx, kEy}},
    {"AdobeRGB", {0.64f, 0.33f, 0.21f, 0.71f, 0.15f, 0.06f, kD65x, kD65y}},
    {"XYZ", {1.0f, 0.0f, 0.0f, 1.0f, 0.0f, 0.0f, kEx, kEy}},
    {"ACES2065-1", {0.7347f, 0.2653f, 0.0f, 1.0f, 0.0001f, -0.077f, kAcesX, kAcesY}},
    {"ACEScg", {0.713f, 0.293f, 0.165f, 0.830f, 0.128f, 0.044f, kAcesX, kAcesY}},
};

struct SpaceNames {
    ustring RGB{"RGB"}, rgb{"rgb"}, linear{"linear"}, hsv{"hsv"}, hsl{"hsl"}, YIQ{"YIQ"},
        XYZ{"XYZ"}, xyY{"xyY"}, sRGB{"sRGB"};
};
const SpaceNames& names() {
    static const SpaceNames n;
    return n;
}

} // namespace

ColorSystem::ColorSystem(const char* name, const Chroma& c) : m_name(name) {
    // Primaries and white as xyz (z = 1 - x - y).
    const Vec3 R(c.xRed, c.yRed, 1.0f - (c.xRed + c.yRed));
    const Vec3 G(c.xGreen, c.yGreen, 1.0f - (c.xGreen + c.yGreen));
    const Vec3 B(c.xBlue, c.yBlue, 1.0f - (c.xBlue + c.yBlue));
    const Vec3 W(c.xWhite, c.yWhite, 1.0f - (c.xWhite + c.yWhite));
    // Rows of the unscaled XYZ->RGB matrix are the cross products of the other two primaries;
    // each is then scaled so that the white point (at luminance 1) maps to RGB (1,1,1).
    Vec3 r(G.y * B.z - B.y * G.z, B.x * G.z - G.x * B.z, G.x * B.y - B.x * G.y);
    Vec3 g(B.y * R.z - R.y * B.z, R.x * B.z - B.x * R.z, B.x * R.y - R.x * B.y);
    Vec3 b(R.y * G.z - G.y * R.z, G.x * R.z - R.x * G.z, R.x * G.y - G.x * R.y);
    Vec3 w(r.dot(W), g.dot(W), b.dot(W));
    if (W.y != 0.0f) w *= 1.0f / W.y;
    r /= w.x;
    g /= w.y;
    b /= w.z;
    m_xyzToRgb = Matrix33(r.x, g.x, b.x, r.y, g.y, b.y, r.z, g.z, b.z);
    m_rgbToXyz = m_xyzToRgb.inverse();
    m_luminance = Vec3(m_rgbToXyz[0][1], m_rgbToXyz[1][1], m_rgbToXyz[2][1]);
    // Rounding can leave the weights a hair off summing to one; make them exact when close.
    const float rest = 1.0f - m_luminance.x - m_luminance.y;
    if (std::fabs(rest - m_luminance.z) < 0.001f) m_luminance.z = rest;

    m_blackbodyTable.reserve(kTableSize);
    for (int i = 0; i < kTableSize; ++i) {
        Vec3 rgb = xyzToRgb(blackbodyXyz(tableTemperature(float(i))));
        clampZero(rgb);
        m_blackbodyTable.push_back(Vec3(std::pow(rgb.x, 1.0f / 5.0f), std::pow(rgb.y, 1.0f / 5.0f),
                                        std::pow(rgb.z, 1.0f / 5.0f)));
    }
}

const ColorSystem::Chroma* ColorSystem::chromaticities(std::string_view name) {
    for (const NamedChroma& s : kSystems)
        if (name == s.name) return &s.chroma;
    return nullptr;
}

const ColorSystem* ColorSystem::find(std::string_view name) {
    // Built together on first use (a thread-safe static); read-only afterwards.
    static const std::vector<std::unique_ptr<ColorSystem>> systems = [] {
        std::vector<std::unique_ptr<ColorSystem>> v;
        for (const NamedChroma& s : kSystems)
            v.push_back(std::make_unique<ColorSystem>(s.name, s.chroma));
        return v;
    }();
    for (const auto& s : systems)
        if (s->name() == name) return s.get();
    return nullptr;
}

const ColorSystem& ColorSystem::findOrDefault(std::string_view name) {
    const ColorSystem* s = find(name);
    return s ? *s : *find("Rec709");
}

Dual2<float> ColorSystem::luminance(const DColor& rgb) const {
    const Tri<D2> t = toTri(rgb);
    return t.x * D2(m_luminance.x) + t.y * D2(m_luminance.y) + t.z * D2(m_luminance.z);
}

Vec3 ColorSystem::blackbody(float kelvin) const {
    if (kelvin < kDraper) return Vec3(1.0e-6f, 0.0f, 0.0f); // a trace of red, never black
    if (kelvin < kTableMax) {
        const float t = tableIndex(kelvin);
        const int i = std::min(int(t), kTableSize - 2);
        const float f = t - float(i);
        const Vec3 c =
            m_blackbodyTable[size_t(i)] * (1.0f - f) + m_blackbodyTable[size_t(i) + 1] * f;
        const Vec3 c2 = c * c;
        return c2 * c2 * c;
    }
    Vec3 rgb = xyzToRgb(blackbodyXyz(kelvin));
    clampZero(rgb);
    return rgb;
}

Vec3 ColorSystem::wavelengthColor(float nm) const {
    const float pos = (nm - 380.0f) / 5.0f;
    const int i = int(pos);
    if (i < 0 || i >= 80) return Vec3(0.0f);
    const float f = pos - float(i);
    const Vec3 a(kCieMatch[i][0], kCieMatch[i][1], kCieMatch[i][2]);
    const Vec3 b(kCieMatch[i + 1][0], kCieMatch[i + 1][1], kCieMatch[i + 1][2]);
    Vec3 rgb = xyzToRgb(a * (1.0f - f) + b * f);
    rgb *= float(1.0 / 2.52); // keeps every component of the visible spectrum within [0,1]
    clampZero(rgb);
    return rgb;
}

bool ColorSystem::isRgbName(ustring s) const {
    const SpaceNames& n = names();
    return s == n.RGB || s == n.rgb || s == n.linear || s == m_name;
}

bool ColorSystem::isBuiltin(ustring s) const {
    const SpaceNames& n = names();
    return s == n.RGB || s == n.rgb || s == n.linear || s == m_name || s == n.hsv || s == n.hsl ||
           s == n.YIQ || s == n.XYZ || s == n.xyY || s == n.sRGB;
}

template <class T>
bool ColorSystem::transformT(ustring from, ustring to, const T& c, T& out) const {
    using S = decltype(toTri(c).x);
    const SpaceNames& n = names();
    const Tri<S> in = toTri(c);
    Tri<S> rgb;
    if (from == n.RGB || from == n.rgb || from == n.linear || from == m_name)
        rgb = in;
    else if (from == n.hsv)
        rgb = hsvToRgb(in);
    else if (from == n.hsl)
        rgb = hslToRgb(in);
    else if (from == n.YIQ)
        rgb = mulRow(in, kYiqToRgb);
    else if (from == n.XYZ)
        rgb = mulRow(in, m_xyzToRgb);
    else if (from == n.xyY)
        rgb = mulRow(xyYToXyz(in), m_xyzToRgb);
    else if (from == n.sRGB)
        rgb = {srgbToLinear1(in.x), srgbToLinear1(in.y), srgbToLinear1(in.z)};
    else
        return false;

    Tri<S> r;
    if (to == n.RGB || to == n.rgb || to == n.linear || to == m_name)
        r = rgb;
    else if (to == n.hsv)
        r = rgbToHsv(rgb);
    else if (to == n.hsl)
        r = rgbToHsl(rgb);
    else if (to == n.YIQ)
        r = mulRow(rgb, kRgbToYiq);
    else if (to == n.XYZ)
        r = mulRow(rgb, m_rgbToXyz);
    else if (to == n.xyY)
        r = xyzToXyY(mulRow(rgb, m_rgbToXyz));
    else if (to == n.sRGB)
        r = {linearToSrgb1(rgb.x), linearToSrgb1(rgb.y), linearToSrgb1(rgb.z)};
    else
        return false;
    out = fromTri(r);
    return true;
}

bool ColorSystem::transform(ustring from, ustring to, const Vec3& c, Vec3& out) const {
    return transformT(from, to, c, out);
}
bool ColorSystem::transform(ustring from, ustring to, const DColor& c, DColor& out) const {
    return transformT(from, to, c, out);
}

bool ColorSystem::toRgb(ustring from, const Vec3& c, Vec3& rgb) const {
    const SpaceNames& n = names();
    if (from == n.linear || from == n.sRGB) return false;
    return transform(from, n.RGB, c, rgb);
}

// ---- external configuration
// -----------------------------------------------------------------------

ExternalColorTransforms& ExternalColorTransforms::instance() {
    static ExternalColorTransforms t;
    return t;
}

OIIO::ColorProcessorHandle ExternalColorTransforms::find(ustring from, ustring to) {
    // Each thread keeps what it has looked up, so repeated conversions skip the shared lock.
    thread_local std::unordered_map<std::string, OIIO::ColorProcessorHandle> local;
    const std::string key = from.string() + '\n' + to.string();
    if (auto hit = local.find(key); hit != local.end()) return hit->second;
    std::lock_guard<std::mutex> lock(m_mutex);
    auto it = m_cache.find(key);
    if (it != m_cache.end()) return local[key] = it->second;
    if (!m_config) m_config = std::make_unique<OIIO::ColorConfig>();
    OIIO::ColorProcessorHandle p = m_config->createColorProcessor(from, to);
    if (!p) (void)m_config->geterror(); // an unknown space: the caller reports it
    m_cache.emplace(key, p);
    return local[key] = p;
}

Vec3 ExternalColorTransforms::apply(const OIIO::ColorProcessor& p, const Vec3& c) {
    float px[3] = {c.x, c.y, c.z};
    p.apply(px, 1, 1, 3, sizeof(float), 3 * sizeof(float), 3 * sizeof(float));
    return Vec3(px[0], px[1], px[2]);
}

DColor ExternalColorTransforms::apply(const OIIO::ColorProcessor& p, const DColor& c) {
    // Three pixels: the value and the value stepped along each derivative.
    float px[9] = {c.val().x,
                   c.val().y,
                   c.val().z,
                   c.val().x + c.dx().x,
                   c.val().y + c.dx().y,
                   c.val().z + c.dx().z,
                   c.val().x + c.dy().x,
                   c.val().y + c.dy().y,
                   c.val().z + c.dy().z};
    p.apply(px, 3, 1, 3, sizeof(float), 3 * sizeof(float), 9 * sizeof(float));
    const Vec3 v(px[0], px[1], px[2]);
    return DColor(v, Vec3(px[3], px[4], px[5]) - v, Vec3(px[6], px[7], px[8]) - v);
}

} // namespace OSL
