// Colour evaluation with the per-sample cache, and bump from differences of the mono value.
#include <trelm/scene/mapped_texmap.h>

#include <algorithm>
#include <cmath>

namespace TrelmSDK {

AColor MappedTexmap::EvalColor(ShadeContext& sc) {
    AColor c;
    if (sc.GetCache(this, c)) return c;
    if (GetGBufID() != 0) sc.SetGBufferID(GetGBufID());
    Point2 uv, dx, dy;
    uvGen.GetUV(sc, uv, dx, dy);
    c = Lookup(sc, uv, dx, dy);
    sc.PutCache(this, c);
    return c;
}

Point3 MappedTexmap::EvalNormalPerturb(ShadeContext& sc) {
    Point3 cached;
    if (sc.GetCache(this, cached)) return cached;
    const int chan = uvGen.channel;
    const Point3 uvw = sc.UVW(chan);
    Point3 ddx, ddy;
    sc.UVWDerivatives(chan, ddx, ddy);
    // Central differences over half the pixel footprint, never narrower than a tiny step.
    const float hu = std::max(0.5f * (std::fabs(ddx.x) + std::fabs(ddy.x)), 1e-4f);
    const float hv = std::max(0.5f * (std::fabs(ddx.y) + std::fabs(ddy.y)), 1e-4f);
    const Point2 fdx = uvGen.ApplyToDerivative(Point2(ddx.x, ddx.y));
    const Point2 fdy = uvGen.ApplyToDerivative(Point2(ddy.x, ddy.y));
    auto mono = [&](float du, float dv) {
        return Intens(Lookup(sc, uvGen.Apply(Point2(uvw.x + du, uvw.y + dv)), fdx, fdy));
    };
    const float mu = (mono(hu, 0) - mono(-hu, 0)) / (2 * hu);
    const float mv = (mono(0, hv) - mono(0, -hv)) / (2 * hv);

    // The surface gradient of the height: the dual basis of dP/du, dP/dv weighted by the slopes.
    Point3 dp[3];
    sc.DPdUVW(dp, chan);
    const float a = dp[0].dot(dp[0]), b = dp[0].dot(dp[1]), c = dp[1].dot(dp[1]);
    const float det = a * c - b * b;
    Point3 result(0);
    if (std::fabs(det) > 1e-20f) {
        const Point3 gu = (dp[0] * c - dp[1] * b) / det;
        const Point3 gv = (dp[1] * a - dp[0] * b) / det;
        result = -(gu * mu + gv * mv);
    }
    sc.PutCache(this, result);
    return result;
}

} // namespace TrelmSDK
