// Lights of the simple lit material: directional and point lights, plus ambient.
#pragma once

#include <trelm/scene/geom_types.h>

namespace TrelmSDK {

struct Light {
    enum Kind { DIRECTIONAL, POINT } kind = DIRECTIONAL;
    Point3 position{0};         // point lights, world
    Point3 direction{0, 0, -1}; // directional lights: the direction the light travels, world
    Color color{1, 1, 1};
    float intensity = 1.0f;
    bool castShadows = true;
};

} // namespace TrelmSDK
