// Geometry helpers of the host's scene on top of the SDK's value types: rays, boxes, the
// mean of a colour and the transforms scene files build.
#pragma once

#include <trelm/core/math_types.h>

#include <Imath/ImathBox.h>

namespace TrelmSDK {

using Box3 = Imath::Box3f;

// A ray with an origin and a direction (not necessarily unit length).
struct Ray {
    Point3 p;
    Point3 dir;
};

// Mean of the three channels: the single-channel reading of a colour.
inline float Intens(const AColor& c) {
    return (c.r + c.g + c.b) / 3.0f;
}
inline Color RGB(const AColor& c) {
    return Color(c.r, c.g, c.b);
}

inline Matrix3 TransMatrix(const Point3& t) {
    return Matrix3(Point3(1, 0, 0), Point3(0, 1, 0), Point3(0, 0, 1), t);
}
inline Matrix3 ScaleMatrix(const Point3& s) {
    return Matrix3(Point3(s.x, 0, 0), Point3(0, s.y, 0), Point3(0, 0, s.z), Point3(0, 0, 0));
}
// Rotation by Euler angles in degrees, applied about x, then y, then z.
Matrix3 RotateXYZMatrix(const Point3& degrees);

// A normal of the object frame in the frame tm maps to, given tm's inverse (unit length).
inline Point3 TransformNormal(const Matrix3& inverse, const Point3& n) {
    return Point3(inverse.GetRow(0).dot(n), inverse.GetRow(1).dot(n), inverse.GetRow(2).dot(n))
        .normalized();
}

} // namespace TrelmSDK
