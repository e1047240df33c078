// The active view the scene renders through: a perspective or orthographic camera.
#pragma once

#include <trelm/scene/geom_types.h>

namespace TrelmSDK {

// Camera space looks down -Z with +Y up and +X to the right.
class ViewCamera {
public:
    bool perspective = true;
    float fov = 0.785398f; // horizontal field of view in radians (perspective)
    float orthoWidth = 10; // width of the view in world units (orthographic)
    float clipNear = 0.1f;
    float clipFar = 1000.0f;
    Matrix3 cameraToWorld; // the camera's node transform

    bool IsPerspective() const { return perspective; }
    float GetFOV() const { return fov; }
    // The view's scale for a field of view: for an orthographic view, its width in world units
    // over 400 (the width of a reference viewport in pixels); for a perspective one, the
    // tangent of half the field of view.
    float GetViewScale(float fovRadians) const;
    Matrix3 WorldToCamera() const { return Inverse(cameraToWorld); }

    // Places the camera at eye looking at target, with up as the approximate up direction.
    void LookAt(const Point3& eye, const Point3& target, const Point3& up);
};

} // namespace TrelmSDK
