// Filling a shading context from a ray hit: frames, mapping channels and ray-differential
// derivatives.
#include <trelm/render/hit_shade_context.h>
#include <trelm/render/ray_trace.h>

#include <cmath>

namespace TrelmSDK {

namespace {

// Where a neighbouring ray meets the tangent plane at p with normal n, relative to p.
Point3 PlaneOffset(const Ray& r, const Point3& p, const Point3& n) {
    const float denom = n.dot(r.dir);
    if (std::fabs(denom) < 1e-12f) return Point3(0, 0, 0);
    const float t = n.dot(p - r.p) / denom;
    return r.p + r.dir * t - p;
}

// Least-squares (a, b) with a*u + b*v closest to d.
void SolveTangent(const Point3& u, const Point3& v, const Point3& d, float& a, float& b) {
    const float uu = u.dot(u), uv = u.dot(v), vv = v.dot(v);
    const float du = d.dot(u), dv = d.dot(v);
    const float det = uu * vv - uv * uv;
    if (std::fabs(det) < 1e-20f) {
        a = b = 0;
        return;
    }
    a = (du * vv - dv * uv) / det;
    b = (dv * uu - du * uv) / det;
}

Point3 Mul(const Point3& a, const Point3& b) {
    return Point3(a.x * b.x, a.y * b.y, a.z * b.z);
}

} // namespace

void HitShadeContext::Setup(const ViewFrame& view, INode* node, Object* obj,
                            const Matrix3& objToWorld, const Matrix3& worldToObj,
                            const SurfaceHit& hit, const CameraRay& ray, TimeValue t, int level) {
    ClearCache();
    view_ = view;
    node_ = node;
    obj_ = obj;
    hit_ = hit;
    time_ = t;
    rayLevel = level;
    mtlNum = hit.mtlNum;
    gbufId = 0;
    pixel_ = ray.pixel;
    objToCam_ = objToWorld * view.worldToCam;
    camToObj_ = view.camToWorld * worldToObj;

    pw_ = objToWorld.PointTransform(hit.p);
    ngw_ = TransformNormal(worldToObj, hit.ng);
    const Point3 nw = TransformNormal(worldToObj, hit.n);
    const Point3 dpdu = objToWorld.VectorTransform(hit.dpdu);
    const Point3 dpdv = objToWorld.VectorTransform(hit.dpdv);
    const Point3 dpdw = objToWorld.VectorTransform(hit.dpdw);
    backFace = ray.ray.dir.dot(ngw_) > 0;

    Point3 dpdxw(0, 0, 0), dpdyw(0, 0, 0);
    duvwdx_ = duvwdy_ = Point3(0, 0, 0);
    if (ray.hasDifferentials) {
        dpdxw = PlaneOffset(ray.dx, pw_, ngw_);
        dpdyw = PlaneOffset(ray.dy, pw_, ngw_);
        SolveTangent(dpdu, dpdv, dpdxw, duvwdx_.x, duvwdx_.y);
        SolveTangent(dpdu, dpdv, dpdyw, duvwdy_.x, duvwdy_.y);
    }

    const Matrix3& w2c = view.worldToCam;
    p_ = w2c.PointTransform(pw_);
    ng_ = w2c.VectorTransform(ngw_).normalized();
    n_ = origN_ = w2c.VectorTransform(nw).normalized();
    dpdx_ = w2c.VectorTransform(dpdxw);
    dpdy_ = w2c.VectorTransform(dpdyw);
    dpduvw_[0] = w2c.VectorTransform(dpdu);
    dpduvw_[1] = w2c.VectorTransform(dpdv);
    dpduvw_[2] = w2c.VectorTransform(dpdw);
    const Point3 dirCam = w2c.VectorTransform(ray.ray.dir);
    v_ = dirCam.length2() > 0 ? dirCam.normalized() : Point3(0, 0, -1);
    camPos_ = view.perspective ? Point3(0, 0, 0) : w2c.PointTransform(ray.ray.p);
}

Point3 HitShadeContext::UVW(int chan) {
    const ChannelMapping* m = obj_ ? obj_->Channel(chan) : nullptr;
    if (!m) return Point3(0, 0, 0);
    return Mul(hit_.uvw, m->scale) + m->offset;
}

void HitShadeContext::UVWDerivatives(int chan, Point3& ddx, Point3& ddy) {
    const ChannelMapping* m = obj_ ? obj_->Channel(chan) : nullptr;
    if (!m) {
        ddx = ddy = Point3(0, 0, 0);
        return;
    }
    ddx = Mul(duvwdx_, m->scale);
    ddy = Mul(duvwdy_, m->scale);
}

Point3 HitShadeContext::DUVW(int chan) {
    Point3 dx, dy;
    UVWDerivatives(chan, dx, dy);
    return Point3(std::fabs(dx.x) + std::fabs(dy.x), std::fabs(dx.y) + std::fabs(dy.y),
                  std::fabs(dx.z) + std::fabs(dy.z));
}

void HitShadeContext::DPdUVW(Point3 dP[3], int chan) {
    const ChannelMapping* m = obj_ ? obj_->Channel(chan) : nullptr;
    for (int i = 0; i < 3; ++i) {
        const float s = m ? m->scale[i] : 0.0f;
        dP[i] = s != 0 ? dpduvw_[i] / s : Point3(0, 0, 0);
    }
}

bool HitShadeContext::BumpBasisVectors(Point3 dP[2], int axis, int chan) {
    Point3 d[3];
    DPdUVW(d, chan);
    const int a = axis == 1 ? 1 : axis == 2 ? 2 : 0;
    const int b = axis == 1 ? 2 : axis == 2 ? 0 : 1;
    for (int k = 0; k < 2; ++k) {
        const Point3 v = k == 0 ? d[a] : d[b];
        const Point3 t = v - n_ * n_.dot(v); // into the surface plane
        if (t.length2() < 1e-24f) return false;
        dP[k] = t.normalized();
    }
    return true;
}

Point3 HitShadeContext::PointTo(const Point3& p, RefFrame ito) {
    switch (ito) {
    case REF_WORLD:
        return view_.camToWorld.PointTransform(p);
    case REF_OBJECT:
        return camToObj_.PointTransform(p);
    default:
        return p;
    }
}

Point3 HitShadeContext::PointFrom(const Point3& p, RefFrame ifrom) {
    switch (ifrom) {
    case REF_WORLD:
        return view_.worldToCam.PointTransform(p);
    case REF_OBJECT:
        return objToCam_.PointTransform(p);
    default:
        return p;
    }
}

Point3 HitShadeContext::VectorTo(const Point3& v, RefFrame ito) {
    switch (ito) {
    case REF_WORLD:
        return view_.camToWorld.VectorTransform(v);
    case REF_OBJECT:
        return camToObj_.VectorTransform(v);
    default:
        return v;
    }
}

Point3 HitShadeContext::VectorFrom(const Point3& v, RefFrame ifrom) {
    switch (ifrom) {
    case REF_WORLD:
        return view_.worldToCam.VectorTransform(v);
    case REF_OBJECT:
        return objToCam_.VectorTransform(v);
    default:
        return v;
    }
}

Matrix3 HitShadeContext::MatrixTo(RefFrame ito) {
    switch (ito) {
    case REF_WORLD:
        return view_.camToWorld;
    case REF_OBJECT:
        return camToObj_;
    default:
        return Matrix3();
    }
}

Matrix3 HitShadeContext::MatrixFrom(RefFrame ifrom) {
    switch (ifrom) {
    case REF_WORLD:
        return view_.worldToCam;
    case REF_OBJECT:
        return objToCam_;
    default:
        return Matrix3();
    }
}

Box3 HitShadeContext::ObjectBox() {
    return obj_ ? obj_->Bound() : Box3();
}

Point2 HitShadeContext::ScreenUV() {
    return Point2(pixel_.x / float(view_.width), pixel_.y / float(view_.height));
}

BaseInterface* HitShadeContext::GetInterface(const Interface_ID& id) {
    if (id == IRAYTRACE_INTERFACE_ID) return tracer_;
    return nullptr;
}

} // namespace TrelmSDK
