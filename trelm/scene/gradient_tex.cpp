// The three-colour gradient, linear along V or radial from the tile centre.
#include <trelm/scene/gradient_tex.h>

#include <algorithm>
#include <cmath>

namespace TrelmSDK {

void GradientTex::Update(TimeValue t, Interval& valid) {
    for (Texmap* m : maps_)
        if (m) m->Update(t, valid);
}

MSTR GradientTex::GetSubTexmapSlotName(int i, bool localized) {
    (void)localized;
    static const wchar_t* names[] = {L"Color 1", L"Color 2", L"Color 3"};
    return i >= 0 && i < 3 ? names[i] : L"";
}

float GradientTex::Position(const Point2& uv) const {
    // Tiled: only the fractional part of the coordinate matters.
    const float fu = uv.x - std::floor(uv.x), fv = uv.y - std::floor(uv.y);
    if (type == Type::Linear) return fv;
    const float d = std::sqrt((fu - 0.5f) * (fu - 0.5f) + (fv - 0.5f) * (fv - 0.5f));
    return std::min(1.0f, 2 * d);
}

AColor GradientTex::Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx, const Point2& dy) {
    (void)dx, (void)dy;
    const float p = Position(uv);
    const float mid = std::clamp(color2Pos, 1e-4f, 1 - 1e-4f);
    auto colour = [&](int i, const AColor& c) { return maps_[i] ? maps_[i]->EvalColor(sc) : c; };
    if (p <= mid) {
        const float t = p / mid;
        return colour(0, color1) * (1 - t) + colour(1, color2) * t;
    }
    const float t = (p - mid) / (1 - mid);
    return colour(1, color2) * (1 - t) + colour(2, color3) * t;
}

} // namespace TrelmSDK
