// Coordinate-system and colour-space conversions used by constructors and transform ops.
#include "transforms.h"
#include "shading_system_impl.h"

#include <cmath>

namespace OSL {

bool getSpaceMatrix(ExecState& st, ustring space, Matrix44& m, bool toCommon) {
    static const ustring common("common"), shader("shader"), object("object");
    ShadingSystemImpl& sys = *st.ctx->system;
    if (space == common || space.string() == "world") {
        m.makeIdentity();
        return true;
    }
    RendererServices* rs = sys.renderer;
    ShaderGlobals* sg = st.sg;
    bool ok = false;
    if (rs) {
        if (space == shader || space == object) {
            TransformationPtr x = space == shader ? sg->shader2common : sg->object2common;
            ok = toCommon ? rs->get_matrix(sg, m, x, sg->time)
                          : rs->get_inverse_matrix(sg, m, x, sg->time);
        } else {
            ok = toCommon ? rs->get_matrix(sg, m, space, sg->time)
                          : rs->get_inverse_matrix(sg, m, space, sg->time);
        }
    }
    if (!ok) m.makeIdentity();
    return ok;
}

Dual2<Vec3> transformDual(const Matrix44& m, const Dual2<Vec3>& v, int kind) {
    Dual2<Vec3> r;
    if (kind == 0) {
        const Vec3& p = v.val();
        const float w = p.x * m[0][3] + p.y * m[1][3] + p.z * m[2][3] + m[3][3];
        Vec3 q;
        m.multVecMatrix(p, q);
        r.val() = q;
        for (int d = 1; d < 3; ++d) {
            Vec3 dv;
            m.multDirMatrix(v.elem(d), dv);
            r.elem(d) = w != 0.0f && w != 1.0f ? dv / w : dv;
        }
        return r;
    }
    const Matrix44 mm = kind == 2 ? m.inverse().transposed() : m;
    for (int d = 0; d < 3; ++d) mm.multDirMatrix(v.elem(d), r.elem(d));
    return r;
}

namespace {

Vec3 hsvToRgb(const Vec3& c) {
    float h = c.x, s = c.y, v = c.z;
    if (s < 0.0001f) return Vec3(v, v, v);
    h = 6.0f * (h - std::floor(h));
    const int hi = int(h);
    const float f = h - float(hi);
    const float p = v * (1.0f - s), q = v * (1.0f - s * f), t = v * (1.0f - s * (1.0f - f));
    switch (hi) {
    case 0:
        return Vec3(v, t, p);
    case 1:
        return Vec3(q, v, p);
    case 2:
        return Vec3(p, v, t);
    case 3:
        return Vec3(p, q, v);
    case 4:
        return Vec3(t, p, v);
    default:
        return Vec3(v, p, q);
    }
}
Vec3 rgbToHsv(const Vec3& c) {
    const float mincomp = std::min(c.x, std::min(c.y, c.z));
    const float maxcomp = std::max(c.x, std::max(c.y, c.z));
    const float delta = maxcomp - mincomp;
    float h = 0.0f, s = 0.0f;
    const float v = maxcomp;
    if (maxcomp > 0.0f) s = delta / maxcomp;
    if (s > 0.0f) {
        if (c.x >= maxcomp)
            h = (c.y - c.z) / delta;
        else if (c.y >= maxcomp)
            h = 2.0f + (c.z - c.x) / delta;
        else
            h = 4.0f + (c.x - c.y) / delta;
        h /= 6.0f;
        if (h < 0.0f) h += 1.0f;
    }
    return Vec3(h, s, v);
}
Vec3 hslToRgb(const Vec3& c) {
    const float h = c.x, s = c.y, l = c.z;
    const float v = l <= 0.5f ? l * (1.0f + s) : l * (1.0f - s) + s;
    if (v <= 0.0f) return Vec3(0.0f);
    const float minv = 2.0f * l - v;
    const float sv = (v - minv) / v;
    return hsvToRgb(Vec3(h, sv, v));
}
Vec3 rgbToHsl(const Vec3& c) {
    const float minval = std::min(c.x, std::min(c.y, c.z));
    const float maxval = std::max(c.x, std::max(c.y, c.z));
    float h = 0.0f, s = 0.0f;
    const float l = (minval + maxval) / 2.0f;
    if (maxval != minval) {
        const float d = maxval - minval;
        s = l <= 0.5f ? d / (maxval + minval) : d / (2.0f - maxval - minval);
        if (c.x == maxval)
            h = (c.y - c.z) / d;
        else if (c.y == maxval)
            h = 2.0f + (c.z - c.x) / d;
        else
            h = 4.0f + (c.x - c.y) / d;
        h /= 6.0f;
        if (h < 0.0f) h += 1.0f;
    }
    return Vec3(h, s, l);
}

// Rec709 primaries with a D65 white point.
const Matrix33 kRgbToXyz(0.412453f, 0.212671f, 0.019334f, 0.357580f, 0.715160f, 0.119193f,
                         0.180423f, 0.072169f, 0.950227f);

Vec3 mul(const Vec3& v, const Matrix33& m) {
    return v * m;
}

} // namespace

bool colorFromSpace(ustring space, const Vec3& c, Vec3& rgb) {
    const std::string_view s = space.string();
    if (s == "rgb" || s == "RGB" || s == "linear" || s.empty())
        rgb = c;
    else if (s == "hsv")
        rgb = hsvToRgb(c);
    else if (s == "hsl")
        rgb = hslToRgb(c);
    else if (s == "YIQ")
        rgb = Vec3(c.x + 0.9557f * c.y + 0.6199f * c.z, c.x - 0.2716f * c.y - 0.6469f * c.z,
                   c.x - 1.1082f * c.y + 1.7051f * c.z);
    else if (s == "XYZ")
        rgb = mul(c, kRgbToXyz.inverse());
    else if (s == "xyY") {
        const Vec3 xyz =
            c.y > 0.0f ? Vec3(c.x * c.z / c.y, c.z, (1.0f - c.x - c.y) * c.z / c.y) : Vec3(0.0f);
        rgb = mul(xyz, kRgbToXyz.inverse());
    } else
        return false;
    return true;
}

bool colorToSpace(ustring space, const Vec3& rgb, Vec3& c) {
    const std::string_view s = space.string();
    if (s == "rgb" || s == "RGB" || s == "linear" || s.empty())
        c = rgb;
    else if (s == "hsv")
        c = rgbToHsv(rgb);
    else if (s == "hsl")
        c = rgbToHsl(rgb);
    else if (s == "YIQ")
        c = Vec3(0.299f * rgb.x + 0.587f * rgb.y + 0.114f * rgb.z,
                 0.596f * rgb.x - 0.275f * rgb.y - 0.321f * rgb.z,
                 0.212f * rgb.x - 0.523f * rgb.y + 0.311f * rgb.z);
    else if (s == "XYZ")
        c = mul(rgb, kRgbToXyz);
    else if (s == "xyY") {
        const Vec3 xyz = mul(rgb, kRgbToXyz);
        const float sum = xyz.x + xyz.y + xyz.z;
        c = sum > 0.0f ? Vec3(xyz.x / sum, xyz.y / sum, xyz.y) : Vec3(0.0f);
    } else
        return false;
    return true;
}

} // namespace OSL
