// The gradient map: three colours (or the maps in their slots) blended along V, linearly or
// radially from the tile centre, with the middle colour at an adjustable position.
#pragma once

#include <trelm/scene/mapped_texmap.h>

namespace TrelmSDK {

class GradientTex : public MappedTexmap {
public:
    enum class Type { Linear, Radial };

    Class_ID ClassID() const override { return Class_ID(0x270, 0); }
    void GetClassName(MSTR& s, bool localized = true) const override {
        (void)localized;
        s = L"Gradient";
    }

    AColor color1{0, 0, 0, 1}; // at 0
    AColor color2{0.5f, 0.5f, 0.5f, 1};
    AColor color3{1, 1, 1, 1}; // at 1
    float color2Pos = 0.5f;    // in (0, 1)
    Type type = Type::Linear;

    void Update(TimeValue t, Interval& valid) override;
    int NumSubTexmaps() override { return 3; }
    Texmap* GetSubTexmap(int i) override { return i >= 0 && i < 3 ? maps_[i] : nullptr; }
    void SetSubTexmap(int i, Texmap* m) override {
        if (i >= 0 && i < 3) maps_[i] = m;
    }
    MSTR GetSubTexmapSlotName(int i, bool localized = true) override;

    // The gradient parameter (0 to 1) at a map coordinate.
    float Position(const Point2& uv) const;
    AColor Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx, const Point2& dy) override;

private:
    Texmap* maps_[3] = {nullptr, nullptr, nullptr};
};

} // namespace TrelmSDK
