// The renderer's ray-tracing interface, offered by its shading contexts through GetInterface.
#pragma once

#include <trelm/core/core_interface.h>
#include <trelm/scene/geom_types.h>

namespace TrelmSDK {

class ShadeContext;

inline constexpr Interface_ID IRAYTRACE_INTERFACE_ID(0x57260B1F, 0x560F06CA);

// Result of one traced ray: hitDist > 0 when something was hit; position and normal in the world
// frame (where shaders read them), colour as shaded.
struct TraceRecord {
    float hitDist = 0;
    float P[3] = {0, 0, 0};
    float color[3] = {0, 0, 0};
    float N[3] = {0, 0, 0};
};

class IRayTrace : public BaseInterface {
public:
    Interface_ID GetID() const override { return IRAYTRACE_INTERFACE_ID; }
    // Traces from p along dir (both in the context's internal frame), accepting hits between
    // minDist and maxDist along the normalised direction. With shade, the hit is shaded one ray
    // level deeper than sc (black beyond the render's depth limit); without, its colour is black.
    // traceSet names a group of objects; this renderer has no groups and traces against all.
    // Returns whether something was hit; the record is written either way.
    virtual bool TraceRay(ShadeContext& sc, const Point3& p, const Point3& dir, float minDist,
                          float maxDist, bool shade, const char* traceSet, TraceRecord& rec) = 0;
};

} // namespace TrelmSDK
