// The shading context of a ray hit: surface data in the camera frame, mapping channels, and
// screen-space derivatives from the ray's differentials.
#pragma once

#include <trelm/scene/object.h>
#include <trelm/scene/shade_context.h>

namespace TrelmSDK {

class IRayTrace;

// A ray in the world frame with, when known, its neighbours one pixel to the right (dx) and one
// pixel up (dy).
struct CameraRay {
    Ray ray;
    bool hasDifferentials = false;
    Ray dx, dy;
    Point2 pixel{0, 0}; // position in the image, pixels from the top-left corner
};

// How the render sees the world: the camera frame and the output size.
struct ViewFrame {
    Matrix3 camToWorld, worldToCam;
    bool perspective = true;
    int width = 1, height = 1;
};

// One per sample, on the stack of the render thread that shades it; nothing in it is shared.
class HitShadeContext : public ShadeContext {
public:
    // Fills the context for hit (object frame) on node's object seen along ray. Clears the
    // per-sample caches.
    void Setup(const ViewFrame& view, INode* node, Object* obj, const Matrix3& objToWorld,
               const Matrix3& worldToObj, const SurfaceHit& hit, const CameraRay& ray, TimeValue t,
               int level);
    void SetRayTracer(IRayTrace* tracer) { tracer_ = tracer; }

    Point3 P() override { return p_; }
    Point3 DPdx() override { return dpdx_; }
    Point3 DPdy() override { return dpdy_; }
    Point3 V() override { return v_; }
    Point3 CamPos() override { return camPos_; }
    int ProjType() override { return view_.perspective ? PROJ_PERSPECTIVE : PROJ_PARALLEL; }

    Point3 Normal() override { return n_; }
    void SetNormal(const Point3& n) override { n_ = n; }
    Point3 OrigNormal() override { return origN_; }
    Point3 GNormal() override { return ng_; }

    Point3 UVW(int chan = 1) override;
    Point3 DUVW(int chan = 1) override;
    void UVWDerivatives(int chan, Point3& ddx, Point3& ddy) override;
    void DPdUVW(Point3 dP[3], int chan = 1) override;
    bool BumpBasisVectors(Point3 dP[2], int axis, int chan = 1) override;
    Point3 BarycentricCoords() override { return hit_.bary; }
    int FaceNumber() override { return hit_.face; }

    Point3 PointTo(const Point3& p, RefFrame ito) override;
    Point3 PointFrom(const Point3& p, RefFrame ifrom) override;
    Point3 VectorTo(const Point3& v, RefFrame ito) override;
    Point3 VectorFrom(const Point3& v, RefFrame ifrom) override;
    Matrix3 MatrixTo(RefFrame ito) override;
    Matrix3 MatrixFrom(RefFrame ifrom) override;
    Box3 ObjectBox() override;

    INode* Node() override { return node_; }
    Object* GetEvalObject() override { return obj_; }
    TimeValue CurTime() override { return time_; }
    Point2 ScreenUV() override;
    BaseInterface* GetInterface(const Interface_ID& id) override;

    // World-frame values the renderer lights with.
    const Point3& WorldP() const { return pw_; }
    const Point3& WorldGNormal() const { return ngw_; }
    // Screen derivatives of the channel-1 coordinates before any channel mapping.
    Point3 BaseUVWdx() const { return duvwdx_; }
    Point3 BaseUVWdy() const { return duvwdy_; }

private:
    ViewFrame view_;
    INode* node_ = nullptr;
    Object* obj_ = nullptr;
    IRayTrace* tracer_ = nullptr;
    SurfaceHit hit_;
    Matrix3 objToCam_, camToObj_;
    TimeValue time_ = 0;
    Point3 p_{0, 0, 0}, v_{0, 0, -1}, n_{0, 0, 1}, origN_{0, 0, 1}, ng_{0, 0, 1};
    Point3 camPos_{0, 0, 0};
    Point3 dpdx_{0, 0, 0}, dpdy_{0, 0, 0};
    Point3 dpduvw_[3] = {Point3(0, 0, 0), Point3(0, 0, 0), Point3(0, 0, 0)}; // camera frame
    Point3 duvwdx_{0, 0, 0}, duvwdy_{0, 0, 0};
    Point3 pw_{0, 0, 0}, ngw_{0, 0, 1};
    Point2 pixel_{0, 0};
};

} // namespace TrelmSDK
