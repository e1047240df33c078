// Default answers of the shading context for queries a renderer need not specialise.
#include <trelm/core/texmap.h>
#include <trelm/scene/node.h>
#include <trelm/scene/shade_context.h>

#include <cmath>

namespace TrelmSDK {

Point3 ShadeContext::DP() {
    const Point3 dx = DPdx(), dy = DPdy();
    return Point3(std::fabs(dx.x) + std::fabs(dy.x), std::fabs(dx.y) + std::fabs(dy.y),
                  std::fabs(dx.z) + std::fabs(dy.z));
}

Point3 ShadeContext::ReflectVector() {
    Point3 n = Normal();
    if (BackFace()) n = -n;
    const Point3 v = V();
    return v - n * (2.0f * v.dot(n));
}

Point3 ShadeContext::RefractVector(float ior) {
    Point3 n = Normal();
    float eta = 1.0f / ior;
    if (BackFace()) n = -n, eta = ior;
    const Point3 v = V();
    const float cosi = -v.dot(n);
    const float k = 1.0f - eta * eta * (1.0f - cosi * cosi);
    if (k < 0) return ReflectVector(); // total internal reflection
    return (v * eta + n * (eta * cosi - std::sqrt(k))).normalized();
}

int ShadeContext::NodeID() {
    INode* node = Node();
    return node ? node->GetRenderID() : -1;
}

AColor ShadeContext::EvalEnvironMap(Texmap* map, const Point3& view) {
    (void)map, (void)view;
    return AColor(0, 0, 0, 1);
}

} // namespace TrelmSDK
