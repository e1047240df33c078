// The checker map: two colours (or the maps in their slots) in a two-by-two pattern per tile,
// box-filtered over the sample's footprint.
#pragma once

#include <trelm/scene/mapped_texmap.h>

namespace TrelmSDK {

class CheckerTex : public MappedTexmap {
public:
    Class_ID ClassID() const override { return Class_ID(0x200, 0); }
    void GetClassName(MSTR& s, bool localized = true) const override {
        (void)localized;
        s = L"Checker";
    }

    AColor color1{0, 0, 0, 1};
    AColor color2{1, 1, 1, 1};

    void Update(TimeValue t, Interval& valid) override;
    int NumSubTexmaps() override { return 2; }
    Texmap* GetSubTexmap(int i) override { return i == 0 || i == 1 ? maps_[i] : nullptr; }
    void SetSubTexmap(int i, Texmap* m) override {
        if (i == 0 || i == 1) maps_[i] = m;
    }
    MSTR GetSubTexmapSlotName(int i, bool localized = true) override {
        (void)localized;
        return i == 0 ? L"Color 1" : i == 1 ? L"Color 2" : L"";
    }

    AColor Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx, const Point2& dy) override;

private:
    Texmap* maps_[2] = {nullptr, nullptr};
};

} // namespace TrelmSDK
