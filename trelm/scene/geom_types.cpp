// Rotation matrices from Euler angles.
#include <trelm/scene/geom_types.h>

#include <cmath>

namespace TrelmSDK {

Matrix3 RotateXYZMatrix(const Point3& degrees) {
    const float k = float(M_PI / 180.0);
    const float cx = std::cos(degrees.x * k), sx = std::sin(degrees.x * k);
    const float cy = std::cos(degrees.y * k), sy = std::sin(degrees.y * k);
    const float cz = std::cos(degrees.z * k), sz = std::sin(degrees.z * k);
    const Matrix3 rx(Point3(1, 0, 0), Point3(0, cx, sx), Point3(0, -sx, cx), Point3(0, 0, 0));
    const Matrix3 ry(Point3(cy, 0, -sy), Point3(0, 1, 0), Point3(sy, 0, cy), Point3(0, 0, 0));
    const Matrix3 rz(Point3(cz, sz, 0), Point3(-sz, cz, 0), Point3(0, 0, 1), Point3(0, 0, 0));
    return rx * ry * rz;
}

} // namespace TrelmSDK
