// The checker pattern, box-filtered in closed form over the sample's footprint.
#include <trelm/scene/checker_tex.h>

#include <algorithm>
#include <cmath>

namespace TrelmSDK {

namespace {

// Integral from 0 to x of the square wave that is 1 on [k + 0.5, k + 1) for integer k, in units
// of one cell: it counts the "second colour" length before x.
float SquareWaveIntegral(float x) {
    const float f = std::floor(x);
    return f * 0.5f + std::max(x - f - 0.5f, 0.0f);
}

AColor Lerp(const AColor& a, const AColor& b, float t) {
    return a * (1 - t) + b * t;
}

} // namespace

void CheckerTex::Update(TimeValue t, Interval& valid) {
    for (Texmap* m : maps_)
        if (m) m->Update(t, valid);
}

AColor CheckerTex::Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx, const Point2& dy) {
    const AColor c1 = maps_[0] ? maps_[0]->EvalColor(sc) : color1;
    const AColor c2 = maps_[1] ? maps_[1]->EvalColor(sc) : color2;
    // Two cells per tile: work in half-tile units, where cell parity decides the colour.
    const float s = uv.x * 2, t = uv.y * 2;
    const float ws = std::max(std::fabs(dx.x), std::fabs(dy.x)) * 2;
    const float wt = std::max(std::fabs(dx.y), std::fabs(dy.y)) * 2;
    if (ws < 1e-6f || wt < 1e-6f) {
        const bool second = (int(std::floor(s)) + int(std::floor(t))) & 1;
        return second ? c2 : c1;
    }
    // The fraction of each axis covered by odd cells; their product mixes into the 2D parity.
    // Odd cells along s are those with x in [2k+1, 2k+2): in units of two cells that is the
    // second half of each period.
    auto oddFraction = [](float x, float w) {
        const float x0 = (x - w) * 0.5f, x1 = (x + w) * 0.5f;
        return (SquareWaveIntegral(x1) - SquareWaveIntegral(x0)) / (x1 - x0);
    };
    const float fs = oddFraction(s, ws), ft = oddFraction(t, wt);
    const float second = fs + ft - 2 * fs * ft;
    return Lerp(c1, c2, second);
}

} // namespace TrelmSDK
