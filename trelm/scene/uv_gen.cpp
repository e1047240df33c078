// Map coordinates from a mapping channel: rotation, tiling and offset.
#include <trelm/scene/shade_context.h>
#include <trelm/scene/uv_gen.h>

#include <cmath>

namespace TrelmSDK {

Point2 UVGen::ApplyToDerivative(const Point2& d) const {
    Point2 r = d;
    if (wAngle != 0) {
        const float a = wAngle * float(M_PI / 180.0), c = std::cos(a), s = std::sin(a);
        r = Point2(c * d.x - s * d.y, s * d.x + c * d.y);
    }
    return Point2(r.x * uTiling, r.y * vTiling);
}

Point2 UVGen::Apply(const Point2& uv) const {
    const Point2 centred = ApplyToDerivative(uv - Point2(0.5f));
    return centred + Point2(0.5f * uTiling + uOffset, 0.5f * vTiling + vOffset);
}

void UVGen::GetUV(ShadeContext& sc, Point2& uv, Point2& dx, Point2& dy) const {
    const Point3 uvw = sc.UVW(channel);
    Point3 ddx, ddy;
    sc.UVWDerivatives(channel, ddx, ddy);
    uv = Apply(Point2(uvw.x, uvw.y));
    dx = ApplyToDerivative(Point2(ddx.x, ddx.y));
    dy = ApplyToDerivative(Point2(ddy.x, ddy.y));
}

} // namespace TrelmSDK
