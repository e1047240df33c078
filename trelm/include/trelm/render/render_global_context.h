// What a shading context knows of the render it belongs to: the output, the camera frame and an
// intersection query against the whole scene.
#pragma once

#include <trelm/core/time.h>
#include <trelm/scene/geom_types.h>

#include <cstdint>
#include <vector>

namespace TrelmSDK {

class INode;

// One node a ray meets. Position and normal are in the camera frame; dist is measured along the
// ray's direction normalised to unit length.
struct IntersectionHit {
    float dist = 0;
    INode* node = nullptr;
    int faceNum = 0;
    Point3 p{0, 0, 0};
    Point3 n{0, 0, 1};
};

// Valid while a render runs; every member may be read from any render thread.
class RenderGlobalContext {
public:
    virtual ~RenderGlobalContext() = default;

    int devWidth = 0, devHeight = 0; // output image size in pixels
    float devAspect = 1;             // pixel aspect
    int projType = 0;                // ProjectionType of the camera
    float fov = 0;                   // horizontal field of view, radians (perspective)
    TimeValue time = 0;
    Matrix3 camToWorld, worldToCam;

    // The nodes a ray (camera frame) meets beyond a small offset from its origin, nearest first,
    // at most one entry per node, leaving out the node with handle skipNode (0: none). Returns
    // the number of entries.
    virtual int IntersectWorld(const Ray& ray, uint32_t skipNode,
                               std::vector<IntersectionHit>& hits) = 0;
};

} // namespace TrelmSDK
