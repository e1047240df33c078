// A shading context whose answers a test sets directly.
#pragma once

#include <trelm/scene/shade_context.h>

namespace trelm_test {

using namespace TrelmSDK;

class FixedContext : public ShadeContext {
public:
    Point3 uvw{0, 0, 0}, ddx{0, 0, 0}, ddy{0, 0, 0};
    Point3 dpdu{1, 0, 0}, dpdv{0, 1, 0};
    Point3 normal{0, 0, 1};

    Point3 P() override { return Point3(0, 0, 0); }
    Point3 V() override { return Point3(0, 0, -1); }
    Point3 Normal() override { return normal; }
    void SetNormal(const Point3& n) override { normal = n; }
    Point3 GNormal() override { return normal; }
    Point3 UVW(int) override { return uvw; }
    Point3 DUVW(int) override {
        return Point3(std::abs(ddx.x) + std::abs(ddy.x), std::abs(ddx.y) + std::abs(ddy.y), 0);
    }
    void UVWDerivatives(int, Point3& dx, Point3& dy) override { dx = ddx, dy = ddy; }
    void DPdUVW(Point3 dP[3], int) override { dP[0] = dpdu, dP[1] = dpdv, dP[2] = normal; }
    Point3 PointTo(const Point3& p, RefFrame) override { return p; }
    Point3 PointFrom(const Point3& p, RefFrame) override { return p; }
    Point3 VectorTo(const Point3& v, RefFrame) override { return v; }
    Point3 VectorFrom(const Point3& v, RefFrame) override { return v; }
    Matrix3 MatrixTo(RefFrame) override { return Matrix3(); }
    Matrix3 MatrixFrom(RefFrame) override { return Matrix3(); }
    TimeValue CurTime() override { return 0; }
};

} // namespace trelm_test
