// The active scene and the render-region core interface that answers from it.
#include <trelm/scene/active_scene.h>

namespace TrelmSDK {

namespace {

Scene* gActive = nullptr; // main thread only

class ActiveSceneRegion : public IRenderRegion {
public:
    bool GetRegion(float& x0, float& y0, float& x1, float& y1) const override {
        if (!gActive) return false;
        const RenderRegion& r = gActive->settings.region;
        x0 = r.x0, y0 = r.y0, x1 = r.x1, y1 = r.y1;
        return true;
    }
};

} // namespace

Scene* GetActiveScene() {
    return gActive;
}

void SetActiveScene(Scene* scene) {
    static ActiveSceneRegion region;
    static const bool registered = (RegisterCOREInterface(&region), true);
    (void)registered;
    gActive = scene;
}

Scene::~Scene() {
    for (auto& n : nodes_) n->SetChangeSink(nullptr);
    if (gActive == this) gActive = nullptr;
}

} // namespace TrelmSDK
