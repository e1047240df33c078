// Ray intersection and surface parameterisation of the plane, sphere and box.
#include <trelm/scene/primitives.h>

#include <cmath>

namespace TrelmSDK {

namespace {
constexpr float kPi = 3.14159265358979f;
}

bool PlaneObject::Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const {
    if (ray.dir.z == 0) return false;
    const float t = -ray.p.z / ray.dir.z;
    if (!(t > tmin && t < tmax)) return false;
    const Point3 p = ray.p + ray.dir * t;
    const float hw = width_ * 0.5f, hl = length_ * 0.5f;
    if (p.x < -hw || p.x > hw || p.y < -hl || p.y > hl) return false;
    hit.t = t;
    hit.p = Point3(p.x, p.y, 0);
    hit.ng = hit.n = Point3(0, 0, 1);
    hit.uvw = Point3((p.x + hw) / width_, (p.y + hl) / length_, 0);
    hit.dpdu = Point3(width_, 0, 0);
    hit.dpdv = Point3(0, length_, 0);
    hit.dpdw = Point3(0, 0, 1);
    hit.face = 0;
    hit.mtlNum = 0;
    return true;
}

Box3 PlaneObject::Bound() const {
    return Box3(Point3(-width_ * 0.5f, -length_ * 0.5f, 0),
                Point3(width_ * 0.5f, length_ * 0.5f, 0));
}

bool SphereObject::Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const {
    const float a = ray.dir.dot(ray.dir);
    const float b = 2 * ray.p.dot(ray.dir);
    const float c = ray.p.dot(ray.p) - radius_ * radius_;
    const float disc = b * b - 4 * a * c;
    if (disc < 0 || a == 0) return false;
    // The numerically stable pair of roots.
    const float s = std::sqrt(disc);
    const float q = b < 0 ? -0.5f * (b - s) : -0.5f * (b + s);
    float t0 = q / a, t1 = q != 0 ? c / q : t0;
    if (t0 > t1) std::swap(t0, t1);
    float t = t0 > tmin && t0 < tmax ? t0 : (t1 > tmin && t1 < tmax ? t1 : -1);
    if (t < 0) return false;
    Point3 p = ray.p + ray.dir * t;
    p *= radius_ / p.length(); // back onto the surface
    const Point3 n = p / radius_;
    float phi = std::atan2(p.y, p.x);
    if (phi < 0) phi += 2 * kPi;
    const float theta = std::acos(std::fmax(-1.0f, std::fmin(1.0f, n.z)));
    hit.t = t;
    hit.p = p;
    hit.ng = hit.n = n;
    hit.uvw = Point3(phi / (2 * kPi), 1 - theta / kPi, 0);
    // P = r (cos phi sin theta, sin phi sin theta, cos theta), phi = 2 pi u, theta = pi (1 - v).
    hit.dpdu = Point3(-p.y, p.x, 0) * (2 * kPi);
    hit.dpdv = Point3(std::cos(phi) * p.z, std::sin(phi) * p.z, -radius_ * std::sin(theta)) * -kPi;
    hit.dpdw = n;
    hit.face = 0;
    hit.mtlNum = 0;
    return true;
}

Box3 SphereObject::Bound() const {
    return Box3(Point3(-radius_), Point3(radius_));
}

bool BoxObject::Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const {
    float tnear = tmin, tfar = tmax;
    int nearAxis = -1, farAxis = -1;
    for (int i = 0; i < 3; ++i) {
        if (ray.dir[i] == 0) {
            if (ray.p[i] < -half_[i] || ray.p[i] > half_[i]) return false;
            continue;
        }
        float t0 = (-half_[i] - ray.p[i]) / ray.dir[i];
        float t1 = (half_[i] - ray.p[i]) / ray.dir[i];
        if (t0 > t1) std::swap(t0, t1);
        if (t0 > tnear) tnear = t0, nearAxis = i;
        if (t1 < tfar) tfar = t1, farAxis = i;
        if (tnear > tfar) return false;
    }
    // From outside the first face crossed; from inside the exit face.
    float t;
    int axis;
    if (nearAxis >= 0 && tnear > tmin)
        t = tnear, axis = nearAxis;
    else if (farAxis >= 0 && tfar < tmax)
        t = tfar, axis = farAxis;
    else
        return false;
    const Point3 p = ray.p + ray.dir * t;
    const float sign = p[axis] > 0 ? 1.0f : -1.0f;
    Point3 n(0);
    n[axis] = sign;
    // U and V follow the two other axes so that (U, V, N) is right-handed.
    const int ua = (axis + 1) % 3, va = (axis + 2) % 3;
    Point3 du(0), dv(0);
    du[ua] = 2 * half_[ua] * sign;
    dv[va] = 2 * half_[va];
    const float u = (p[ua] * sign + half_[ua]) / (2 * half_[ua]);
    const float v = (p[va] + half_[va]) / (2 * half_[va]);
    hit.t = t;
    hit.p = p;
    hit.ng = hit.n = n;
    hit.uvw = Point3(u, v, 0);
    hit.dpdu = du;
    hit.dpdv = dv;
    hit.dpdw = n;
    hit.face = axis * 2 + (sign > 0 ? 1 : 0);
    hit.mtlNum = hit.face;
    return true;
}

} // namespace TrelmSDK
