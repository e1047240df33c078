// Analytic primitives: a plane in the XY plane, a sphere and a box, all centred on the origin.
#pragma once

#include <trelm/scene/object.h>

namespace TrelmSDK {

// A rectangle of width (x) by length (y) facing +Z; U runs along x and V along y, 0 to 1.
class PlaneObject : public Object {
public:
    PlaneObject(float width, float length) : width_(width), length_(length) {}
    std::string ClassName() const override { return "Plane"; }
    bool Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const override;
    Box3 Bound() const override;

private:
    float width_, length_;
};

// U is the longitude (0 at +X, increasing towards +Y), V the latitude from 0 at the -Z pole
// to 1 at the +Z pole.
class SphereObject : public Object {
public:
    explicit SphereObject(float radius) : radius_(radius) {}
    std::string ClassName() const override { return "Sphere"; }
    bool Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const override;
    Box3 Bound() const override;
    float Radius() const { return radius_; }

private:
    float radius_;
};

// Axis-aligned box; every face maps 0 to 1 in U and V. Faces are numbered -X, +X, -Y, +Y, -Z, +Z
// and report their face number as the material number.
class BoxObject : public Object {
public:
    explicit BoxObject(const Point3& size) : half_(size * 0.5f) {}
    std::string ClassName() const override { return "Box"; }
    bool Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const override;
    Box3 Bound() const override { return Box3(-half_, half_); }

private:
    Point3 half_;
};

} // namespace TrelmSDK
