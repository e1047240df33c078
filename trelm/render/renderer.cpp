// Camera rays, scene intersection, the lit material and tiled rendering on the thread pool.
#include <trelm/core/notifications.h>
#include <trelm/core/texmap.h>
#include <trelm/render/renderer.h>
#include <trelm/scene/active_scene.h>
#include <trelm/scene/material.h>
#include <trelm/scene/node.h>
#include <trelm/scene/object.h>

#include <algorithm>
#include <cmath>

namespace TrelmSDK {

namespace {

constexpr int kTileSize = 32;
constexpr float kRayOffset = 1e-4f;

bool BoxHit(const Box3& b, const Ray& r, float tmin, float tmax) {
    for (int i = 0; i < 3; ++i) {
        const float inv = 1.0f / r.dir[i];
        float t0 = (b.min[i] - r.p[i]) * inv, t1 = (b.max[i] - r.p[i]) * inv;
        if (inv < 0) std::swap(t0, t1);
        // NaN (0 * inf) leaves the bounds as they are.
        tmin = t0 > tmin ? t0 : tmin;
        tmax = t1 < tmax ? t1 : tmax;
        if (tmin > tmax) return false;
    }
    return true;
}

Box3 TransformBox(const Box3& b, const Matrix3& m) {
    Box3 out;
    if (b.isEmpty()) return out;
    for (int i = 0; i < 8; ++i)
        out.extendBy(m.PointTransform(Point3(i & 1 ? b.max.x : b.min.x, i & 2 ? b.max.y : b.min.y,
                                             i & 4 ? b.max.z : b.min.z)));
    // Flat objects get a little depth so that slab tests stay robust.
    out.min -= Point3(1e-4f, 1e-4f, 1e-4f);
    out.max += Point3(1e-4f, 1e-4f, 1e-4f);
    return out;
}

// Deterministic jitter in [0, 1) for a pixel's sub-sample.
float Jitter(int x, int y, int s, int k) {
    uint32_t h = uint32_t(x) * 0x8DA6B343u ^ uint32_t(y) * 0xD8163841u ^ uint32_t(s) * 0xCB1AB31Fu ^
                 uint32_t(k) * 0x9E3779B9u;
    h ^= h >> 16, h *= 0x7FEB352Du, h ^= h >> 15, h *= 0x846CA68Bu, h ^= h >> 16;
    return float(h >> 8) / float(1u << 24);
}

Color Lerp(const Color& a, const Color& b, float t) {
    return a * (1 - t) + b * t;
}

} // namespace

Renderer::Renderer(int threads) : pool_(threads) {}
Renderer::~Renderer() = default;

bool Renderer::Prepare(Scene& scene, std::string& error) {
    const RenderSettings& s = scene.settings;
    if (s.width < 1 || s.height < 1) {
        error = "the output size must be at least 1 x 1 pixels";
        return false;
    }
    if (!(s.pixelAspect > 0)) {
        error = "the pixel aspect must be above 0";
        return false;
    }
    if (s.type != RENDTYPE_NORMAL && s.type != RENDTYPE_REGION && s.type != RENDTYPE_REGION_CROP) {
        error = "render type " + std::to_string(int(s.type)) + " is not supported";
        return false;
    }
    scene_ = &scene;
    settings_ = s;
    SetActiveScene(&scene);
    scene.FlushNodeChanges();
    BroadcastNotification(NOTIFY_PRE_RENDER, &settings_);
    scene.Update(settings_.time);

    const ViewCamera& cam = scene.camera;
    view_.camToWorld = cam.cameraToWorld;
    view_.worldToCam = Inverse(cam.cameraToWorld);
    view_.perspective = cam.IsPerspective();
    view_.width = settings_.width;
    view_.height = settings_.height;
    aspect_ = settings_.ImageAspect();
    tanHalfFov_ = std::tan(cam.fov * 0.5f);
    orthoHalfWidth_ = cam.orthoWidth * 0.5f;
    clipNear_ = cam.clipNear;
    clipFar_ = cam.clipFar;

    devWidth = settings_.width;
    devHeight = settings_.height;
    devAspect = settings_.pixelAspect;
    projType = view_.perspective ? PROJ_PERSPECTIVE : PROJ_PARALLEL;
    fov = cam.fov;
    time = settings_.time;
    camToWorld = view_.camToWorld;
    worldToCam = view_.worldToCam;

    instances_.clear();
    for (auto& n : scene.Nodes()) {
        Object* obj = n->GetObjectRef();
        if (!obj || !n->Renderable()) continue;
        const Matrix3& tm = n->GetObjectTM();
        bool singular = false;
        if (std::fabs(tm.GetRow(0).dot(tm.GetRow(1).cross(tm.GetRow(2)))) < 1e-20f) singular = true;
        if (singular) continue; // a flattened node has no surface to hit
        instances_.push_back({n.get(), obj, tm, Inverse(tm), TransformBox(obj->Bound(), tm)});
    }
    return true;
}

CameraRay Renderer::MakeCameraRay(float x, float y) const {
    // Camera rays have direction z = -1 so that the ray parameter is the depth, which the clip
    // distances limit.
    auto rayAt = [&](float px, float py) {
        const float sx = 2 * px / float(view_.width) - 1;
        const float sy = 1 - 2 * py / float(view_.height);
        Ray r;
        if (view_.perspective) {
            r.p = Point3(0, 0, 0);
            r.dir = Point3(sx * tanHalfFov_, sy * tanHalfFov_ / aspect_, -1);
        } else {
            r.p = Point3(sx * orthoHalfWidth_, sy * orthoHalfWidth_ / aspect_, 0);
            r.dir = Point3(0, 0, -1);
        }
        return Ray{view_.camToWorld.PointTransform(r.p), view_.camToWorld.VectorTransform(r.dir)};
    };
    CameraRay c;
    c.ray = rayAt(x, y);
    c.dx = rayAt(x + 1, y);
    c.dy = rayAt(x, y - 1); // one pixel up
    c.hasDifferentials = true;
    c.pixel = Point2(x, y);
    return c;
}

int Renderer::Nearest(const Ray& ray, float tmin, float tmax, SurfaceHit& hit,
                      uint32_t skipNode) const {
    int found = -1;
    for (size_t i = 0; i < instances_.size(); ++i) {
        const Instance& in = instances_[i];
        if (skipNode && in.node->GetHandle() == skipNode) continue;
        if (!BoxHit(in.worldBound, ray, tmin, tmax)) continue;
        const Ray local{in.worldToObj.PointTransform(ray.p),
                        in.worldToObj.VectorTransform(ray.dir)};
        SurfaceHit h;
        if (in.obj->Intersect(local, tmin, tmax, h)) {
            hit = h;
            tmax = h.t;
            found = int(i);
        }
    }
    return found;
}

bool Renderer::Occluded(const Ray& ray, float tmax) const {
    SurfaceHit h;
    return Nearest(ray, kRayOffset, tmax, h) >= 0;
}

bool Renderer::HitContext(const CameraRay& ray, HitShadeContext& sc) {
    SurfaceHit hit;
    const int i = Nearest(ray.ray, clipNear_, clipFar_, hit);
    if (i < 0) return false;
    const Instance& in = instances_[i];
    sc.globContext = this;
    sc.SetRayTracer(this);
    sc.doMaps = settings_.mapsEnabled;
    sc.Setup(view_, in.node, in.obj, in.objToWorld, in.worldToObj, hit, ray, settings_.time, 0);
    return true;
}

AColor Renderer::ShadeHit(HitShadeContext& sc, const Ray& worldRay) {
    static const Material kDefault;
    const Material* mtl = sc.Node()->GetMtl();
    if (!mtl) mtl = &kDefault;

    Color diffuse = mtl->diffuse;
    if (Texmap* map = mtl->GetSubTexmap(Material::DIFFUSE_SLOT); map && sc.doMaps)
        diffuse = Lerp(diffuse, RGB(map->EvalColor(sc)), mtl->diffuseMapAmount);

    // Perturb the outward normal, then turn it towards the viewer.
    Point3 n = sc.Normal();
    if (Texmap* bump = mtl->GetSubTexmap(Material::BUMP_SLOT); bump && sc.doMaps) {
        const Point3 bent = n + bump->EvalNormalPerturb(sc) * mtl->bumpAmount;
        if (bent.length2() > 0) n = bent.normalized();
    }
    if (sc.BackFace()) n = -n;
    const Point3 nw = sc.VectorTo(n, REF_WORLD).normalized();
    Point3 ngw = sc.WorldGNormal();
    if (sc.BackFace()) ngw = -ngw;
    const Point3 pw = sc.WorldP();
    const Point3 toEye = -worldRay.dir.normalized();
    const float scale = std::max({std::fabs(pw.x), std::fabs(pw.y), std::fabs(pw.z), 1.0f});
    const Point3 origin = pw + ngw * (kRayOffset * scale);

    Color c = scene_->ambient * diffuse;
    for (const Light& light : scene_->lights) {
        Point3 l;
        float dist = 1e30f, falloff = 1;
        if (light.kind == Light::DIRECTIONAL) {
            l = -light.direction;
        } else {
            l = light.position - pw;
            dist = l.length();
            if (dist <= 0) continue;
            l /= dist;
            falloff = 1.0f / (dist * dist);
        }
        const float ndotl = nw.dot(l);
        if (ndotl <= 0 || ngw.dot(l) <= 0) continue;
        if (settings_.shadows && light.castShadows && Occluded(Ray{origin, l}, dist)) continue;
        const Color radiance = light.color * (light.intensity * falloff);
        const Point3 h = (l + toEye).normalized();
        const float spec = std::pow(std::max(0.0f, nw.dot(h)), std::max(1.0f, mtl->glossiness));
        c += radiance * (diffuse * ndotl + mtl->specular * spec);
    }
    return AColor(c.x, c.y, c.z, 1);
}

AColor Renderer::ShadeRay(const CameraRay& ray, int level) {
    HitShadeContext sc;
    if (!HitContext(ray, sc)) {
        const Color& b = settings_.background;
        return AColor(b.x, b.y, b.z, 0);
    }
    sc.rayLevel = level;
    return ShadeHit(sc, ray.ray);
}

AColor Renderer::Pixel(int x, int y) {
    const int n = settings_.samplesPerAxis;
    if (n <= 1) return ShadeRay(MakeCameraRay(x + 0.5f, y + 0.5f), 0);
    AColor sum(0, 0, 0, 0);
    for (int j = 0; j < n; ++j)
        for (int i = 0; i < n; ++i) {
            const int s = j * n + i;
            CameraRay r =
                MakeCameraRay(x + (i + Jitter(x, y, s, 0)) / n, y + (j + Jitter(x, y, s, 1)) / n);
            // Each sub-sample covers 1/n of the pixel: narrow the differentials to match.
            r.dx.p = r.ray.p + (r.dx.p - r.ray.p) / float(n);
            r.dx.dir = r.ray.dir + (r.dx.dir - r.ray.dir) / float(n);
            r.dy.p = r.ray.p + (r.dy.p - r.ray.p) / float(n);
            r.dy.dir = r.ray.dir + (r.dy.dir - r.ray.dir) / float(n);
            sum += ShadeRay(r, 0);
        }
    return sum * (1.0f / float(n * n));
}

bool Renderer::RenderPrepared(RenderImage& image, const RenderProgress& progress,
                              std::string& error) {
    if (!scene_) {
        error = "no scene was prepared for rendering";
        return false;
    }
    int x0 = 0, y0 = 0, x1 = settings_.width, y1 = settings_.height;
    if (settings_.type != RENDTYPE_NORMAL) {
        const RenderRegion& r = settings_.region;
        x0 = std::clamp(int(std::floor(r.x0 * settings_.width)), 0, settings_.width - 1);
        y0 = std::clamp(int(std::floor(r.y0 * settings_.height)), 0, settings_.height - 1);
        x1 = std::clamp(int(std::ceil(r.x1 * settings_.width)), x0 + 1, settings_.width);
        y1 = std::clamp(int(std::ceil(r.y1 * settings_.height)), y0 + 1, settings_.height);
    }
    const bool crop = settings_.type == RENDTYPE_REGION_CROP;
    const int outX = crop ? x0 : 0, outY = crop ? y0 : 0;
    image.Resize(crop ? x1 - x0 : settings_.width, crop ? y1 - y0 : settings_.height);
    const int tilesX = (x1 - x0 + kTileSize - 1) / kTileSize;
    const int tilesY = (y1 - y0 + kTileSize - 1) / kTileSize;
    // Each tile writes only its own pixels, so the image needs no lock.
    auto tile = [&](int t, int) {
        const int tx = x0 + (t % tilesX) * kTileSize, ty = y0 + (t / tilesX) * kTileSize;
        for (int y = ty; y < std::min(ty + kTileSize, y1); ++y)
            for (int x = tx; x < std::min(tx + kTileSize, x1); ++x)
                image.Set(x - outX, y - outY, Pixel(x, y));
    };
    if (!pool_.Run(tilesX * tilesY, tile, progress)) {
        error = "the render was cancelled";
        return false;
    }
    return true;
}

bool Renderer::Render(Scene& scene, RenderImage& image, const RenderProgress& progress,
                      std::string& error) {
    return Prepare(scene, error) && RenderPrepared(image, progress, error);
}

int Renderer::IntersectWorld(const Ray& ray, uint32_t skipNode,
                             std::vector<IntersectionHit>& hits) {
    hits.clear();
    const Ray world{view_.camToWorld.PointTransform(ray.p),
                    view_.camToWorld.VectorTransform(ray.dir)};
    const float len = world.dir.length();
    if (len == 0) return 0;
    for (const Instance& in : instances_) {
        if (skipNode && in.node->GetHandle() == skipNode) continue;
        if (!BoxHit(in.worldBound, world, kRayOffset / len, 1e30f)) continue;
        const Ray local{in.worldToObj.PointTransform(world.p),
                        in.worldToObj.VectorTransform(world.dir)};
        SurfaceHit h;
        if (!in.obj->Intersect(local, kRayOffset / len, 1e30f, h)) continue;
        IntersectionHit e;
        e.dist = h.t * len;
        e.node = in.node;
        e.faceNum = h.face;
        e.p = view_.worldToCam.PointTransform(in.objToWorld.PointTransform(h.p));
        e.n = view_.worldToCam.VectorTransform(TransformNormal(in.worldToObj, h.ng)).normalized();
        hits.push_back(e);
    }
    std::sort(hits.begin(), hits.end(),
              [](const IntersectionHit& a, const IntersectionHit& b) { return a.dist < b.dist; });
    return int(hits.size());
}

bool Renderer::TraceRay(ShadeContext& sc, const Point3& p, const Point3& dir, float minDist,
                        float maxDist, bool shade, const char* traceSet, TraceRecord& rec) {
    (void)traceSet;
    rec = TraceRecord();
    if (!scene_) return false;
    Point3 d = view_.camToWorld.VectorTransform(dir);
    if (d.length2() == 0) return false;
    d.normalize();
    CameraRay r;
    r.ray = Ray{view_.camToWorld.PointTransform(p), d};
    SurfaceHit hit;
    const int i = Nearest(r.ray, std::max(minDist, 0.0f), maxDist, hit);
    if (i < 0) return false;
    const Instance& in = instances_[i];
    const Point3 pw = in.objToWorld.PointTransform(hit.p);
    const Point3 nw = TransformNormal(in.worldToObj, hit.n);
    rec.hitDist = hit.t;
    for (int k = 0; k < 3; ++k) rec.P[k] = pw[k], rec.N[k] = nw[k];
    const int level = sc.rayLevel + 1;
    if (shade && level <= settings_.maxRayDepth) {
        HitShadeContext hsc;
        hsc.globContext = this;
        hsc.SetRayTracer(this);
        hsc.doMaps = settings_.mapsEnabled;
        r.pixel = Point2(0, 0);
        hsc.Setup(view_, in.node, in.obj, in.objToWorld, in.worldToObj, hit, r, settings_.time,
                  level);
        const AColor c = ShadeHit(hsc, r.ray);
        rec.color[0] = c.r, rec.color[1] = c.g, rec.color[2] = c.b;
    }
    return true;
}

} // namespace TrelmSDK
