// The host's renderer: camera rays through the scene on a thread pool, tile by tile, shading
// hits with a simple lit material that evaluates its maps.
#pragma once

#include <trelm/render/hit_shade_context.h>
#include <trelm/render/ray_trace.h>
#include <trelm/render/render_global_context.h>
#include <trelm/render/render_image.h>
#include <trelm/render/thread_pool.h>
#include <trelm/scene/scene.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace TrelmSDK {

// Called on the thread that started the render with the tiles done so far; false cancels.
using RenderProgress = std::function<bool(int done, int total)>;

class Renderer : public RenderGlobalContext, public IRayTrace {
public:
    // threads <= 0: all hardware threads.
    explicit Renderer(int threads = 0);
    ~Renderer() override;

    int Threads() const { return pool_.Size(); }

    // Prepares the scene on the calling (main) thread: makes it the active scene, sends the
    // changed-nodes notification (132) and the pre-render notification (57, with the
    // RenderSettings), updates objects and
    // maps to the render time, and sets up the camera. Fails with a message when the settings
    // cannot be rendered.
    bool Prepare(Scene& scene, std::string& error);
    // Renders a prepared scene into image (sized from the settings; for a cropped region, the
    // region's size). Returns false when cancelled or not prepared.
    bool RenderPrepared(RenderImage& image, const RenderProgress& progress, std::string& error);
    // Prepare and RenderPrepared.
    bool Render(Scene& scene, RenderImage& image, const RenderProgress& progress,
                std::string& error);

    // The camera ray through image position (x, y) in pixels from the top-left corner, with its
    // differentials.
    CameraRay MakeCameraRay(float x, float y) const;
    // Shades the nearest hit of a camera ray into sc; false when nothing was hit.
    bool HitContext(const CameraRay& ray, HitShadeContext& sc);
    // The colour seen along a camera ray (background with alpha 0 when nothing is hit).
    AColor ShadeRay(const CameraRay& ray, int level);

    // RenderGlobalContext
    int IntersectWorld(const Ray& ray, uint32_t skipNode,
                       std::vector<IntersectionHit>& hits) override;
    // IRayTrace
    bool TraceRay(ShadeContext& sc, const Point3& p, const Point3& dir, float minDist,
                  float maxDist, bool shade, const char* traceSet, TraceRecord& rec) override;

private:
    struct Instance {
        INode* node;
        Object* obj;
        Matrix3 objToWorld, worldToObj;
        Box3 worldBound;
    };
    // Nearest hit in the world frame with tmin < t < tmax; index of the instance or -1.
    int Nearest(const Ray& ray, float tmin, float tmax, SurfaceHit& hit,
                uint32_t skipNode = 0) const;
    bool Occluded(const Ray& ray, float tmax) const;
    AColor ShadeHit(HitShadeContext& sc, const Ray& worldRay);
    AColor Pixel(int x, int y);

    ThreadPool pool_;
    Scene* scene_ = nullptr;
    RenderSettings settings_;
    ViewFrame view_;
    float tanHalfFov_ = 1, orthoHalfWidth_ = 1, aspect_ = 1;
    float clipNear_ = 0, clipFar_ = 1e30f;
    std::vector<Instance> instances_;
};

} // namespace TrelmSDK
