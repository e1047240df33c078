// TrelmRenderServices: the renderer services object the shading system asks for attributes,
// textures, transforms and traces. For now it answers as OSL's defaults do and keeps the
// per-render scene data refresh count; the scene answers come with the renderer services work.
#pragma once

#include <OSL/rendererservices.h>

#include <atomic>

class TrelmRenderServices : public OSL::RendererServices {
public:
    // The single object of the process, constructed on first request.
    static TrelmRenderServices& Instance();

    // Called before a render (host notification 57) to re-read per-render scene data.
    void RefreshSceneData() { sceneRefreshes_.fetch_add(1, std::memory_order_relaxed); }
    int SceneRefreshes() const { return sceneRefreshes_.load(std::memory_order_relaxed); }

private:
    TrelmRenderServices() = default;
    std::atomic<int> sceneRefreshes_{0}; // main thread writes, anyone reads
};
