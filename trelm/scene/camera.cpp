// Placing the camera and the view scale of the active view.
#include <trelm/scene/camera.h>

#include <cmath>

namespace TrelmSDK {

float ViewCamera::GetViewScale(float fovRadians) const {
    if (!perspective) return orthoWidth / 400.0f;
    return std::tan(fovRadians * 0.5f);
}

void ViewCamera::LookAt(const Point3& eye, const Point3& target, const Point3& up) {
    Point3 back = eye - target; // camera +Z points away from what it looks at
    if (back.length2() == 0) back = Point3(0, 0, 1);
    back.normalize();
    Point3 right = up.cross(back);
    if (right.length2() < 1e-12f) right = Point3(0, 1, 0).cross(back);
    if (right.length2() < 1e-12f) right = Point3(1, 0, 0);
    right.normalize();
    const Point3 trueUp = back.cross(right);
    cameraToWorld = Matrix3(right, trueUp, back, eye);
}

} // namespace TrelmSDK
