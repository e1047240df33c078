// The scene the host works on, as the host's global queries see it: the active view, the render
// settings and, through a core interface, the render region.
#pragma once

#include <trelm/core/core_interface.h>
#include <trelm/scene/scene.h>

namespace TrelmSDK {

// Main thread: set when a scene is opened or about to be rendered; null when none.
Scene* GetActiveScene();
void SetActiveScene(Scene* scene);

inline constexpr Interface_ID RENDER_REGION_INTERFACE_ID(0x4880D87A, 0x725D2E7B);

// The render region of the active scene, found with GetCOREInterface(RENDER_REGION_INTERFACE_ID)
// once a scene has been made active.
class IRenderRegion : public FPInterface {
public:
    Interface_ID GetID() const override { return RENDER_REGION_INTERFACE_ID; }
    // The region as fractions of the image from its top-left corner; false without an active
    // scene.
    virtual bool GetRegion(float& x0, float& y0, float& x1, float& y1) const = 0;
};

} // namespace TrelmSDK
