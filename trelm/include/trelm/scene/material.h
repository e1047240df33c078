// A simple lit material: a diffuse colour that a map may replace, a bump map, and a specular
// highlight. Its two map slots are its sub-texture slots.
#pragma once

#include <trelm/scene/geom_types.h>

#include <string>

namespace TrelmSDK {

class Texmap;

class Material {
public:
    enum Slot { DIFFUSE_SLOT = 0, BUMP_SLOT = 1, NUM_SLOTS = 2 };

    std::string name;
    Color diffuse{0.8f, 0.8f, 0.8f};
    float diffuseMapAmount = 1.0f; // blend of the map over the diffuse colour
    float bumpAmount = 1.0f;
    Color specular{0.2f, 0.2f, 0.2f};
    float glossiness = 30.0f; // specular exponent

    int NumSubTexmaps() const { return NUM_SLOTS; }
    Texmap* GetSubTexmap(int i) const { return i >= 0 && i < NUM_SLOTS ? maps_[i] : nullptr; }
    void SetSubTexmap(int i, Texmap* m) {
        if (i >= 0 && i < NUM_SLOTS) maps_[i] = m;
    }
    static const char* GetSubTexmapSlotName(int i) {
        return i == DIFFUSE_SLOT ? "Diffuse" : i == BUMP_SLOT ? "Bump" : "";
    }

private:
    Texmap* maps_[NUM_SLOTS] = {nullptr, nullptr};
};

} // namespace TrelmSDK
