#include <trelm/render/renderer.h>
#include <trelm/scene/primitives.h>

#include <gtest/gtest.h>

#include <cmath>

using namespace TrelmSDK;

namespace {

constexpr float kPi = 3.14159265358979f;

void ExpectNear(const Point3& a, const Point3& b, float eps = 1e-4f) {
    EXPECT_NEAR(a.x, b.x, eps);
    EXPECT_NEAR(a.y, b.y, eps);
    EXPECT_NEAR(a.z, b.z, eps);
}

// A 4 x 2 plane at z = 0 seen straight down from height 10 on an 80 x 40 image.
std::unique_ptr<Scene> PlaneScene(bool perspective, float cameraZ = 10) {
    auto scene = std::make_unique<Scene>();
    scene->settings.width = 80;
    scene->settings.height = 40;
    scene->camera.perspective = perspective;
    scene->camera.orthoWidth = 8;
    scene->camera.fov = 2 * std::atan(0.4f); // tan(fov / 2) = 0.4
    scene->camera.clipFar = 100;
    scene->camera.LookAt(Point3(0, 0, cameraZ), Point3(0, 0, 0), Point3(0, 1, 0));
    INode* node = scene->CreateNode(L"Plane");
    node->SetObjectRef(std::make_shared<PlaneObject>(4.0f, 2.0f));
    return scene;
}

struct Prepared {
    std::unique_ptr<Scene> scene;
    Renderer renderer{1};
    explicit Prepared(std::unique_ptr<Scene> s) : scene(std::move(s)) {
        std::string error;
        EXPECT_TRUE(renderer.Prepare(*scene, error)) << error;
    }
};

} // namespace

TEST(HitShadeContext, OrthographicPlaneUVsAndDerivativesAreExact) {
    Prepared p(PlaneScene(false));
    for (int x : {25, 40, 53}) {
        for (int y : {12, 20, 27}) {
            HitShadeContext sc;
            ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(x + 0.5f, y + 0.5f), sc));
            const float wx = (2 * (x + 0.5f) / 80 - 1) * 4, wy = (1 - 2 * (y + 0.5f) / 40) * 2;
            ExpectNear(sc.PointTo(sc.P(), REF_WORLD), Point3(wx, wy, 0));
            ExpectNear(sc.UVW(1), Point3((wx + 2) / 4, (wy + 1) / 2, 0));
            Point3 dx, dy;
            sc.UVWDerivatives(1, dx, dy);
            // One pixel is 0.1 world units; U spans 4 units and V spans 2.
            ExpectNear(dx, Point3(0.025f, 0, 0), 1e-5f);
            ExpectNear(dy, Point3(0, 0.05f, 0), 1e-5f); // one pixel up: V grows
            ExpectNear(sc.DUVW(1), Point3(0.025f, 0.05f, 0), 1e-5f);
            ExpectNear(sc.VectorTo(sc.DPdx(), REF_WORLD), Point3(0.1f, 0, 0), 1e-5f);
            ExpectNear(sc.VectorTo(sc.DPdy(), REF_WORLD), Point3(0, 0.1f, 0), 1e-5f);
            EXPECT_FALSE(sc.BackFace());
            EXPECT_EQ(sc.ProjType(), PROJ_PARALLEL);
        }
    }
}

TEST(HitShadeContext, PerspectivePlaneDerivativesGrowWithDistance) {
    for (float h : {5.0f, 10.0f}) {
        Prepared p(PlaneScene(true, h));
        HitShadeContext sc;
        const float x = 47.5f, y = 22.5f;
        ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(x, y), sc));
        // Screen x runs over [-1, 1] across 80 pixels; tan(fov / 2) = 0.4 at height h.
        const float sx = 2 * x / 80 - 1, sy = 1 - 2 * y / 40;
        const float wx = sx * 0.4f * h, wy = sy * 0.4f / 2 * h; // image aspect 2
        ExpectNear(sc.PointTo(sc.P(), REF_WORLD), Point3(wx, wy, 0));
        EXPECT_NEAR(sc.P().z, -h, 1e-4f); // camera frame: depth along -Z
        Point3 dx, dy;
        sc.UVWDerivatives(1, dx, dy);
        EXPECT_NEAR(dx.x, 2.0f / 80 * 0.4f * h / 4, 1e-5f);
        EXPECT_NEAR(dy.y, 2.0f / 40 * 0.2f * h / 2, 1e-5f);
        EXPECT_NEAR(dx.y, 0, 1e-6f);
        EXPECT_NEAR(dy.x, 0, 1e-6f);
        // The view vector points from the eye to the point.
        ExpectNear(sc.V(), sc.P().normalized());
    }
}

TEST(HitShadeContext, SphereUVsAndDerivativesMatchNeighbouringPixels) {
    auto scene = std::make_unique<Scene>();
    scene->settings.width = 200;
    scene->settings.height = 200;
    scene->camera.fov = 2 * std::atan(0.3f);
    scene->camera.LookAt(Point3(0, -5, 0.3f), Point3(0, 0, 0), Point3(0, 0, 1));
    INode* node = scene->CreateNode(L"Ball");
    node->SetObjectRef(std::make_shared<SphereObject>(1.0f));
    Prepared p(std::move(scene));
    auto uvAt = [&](float x, float y) {
        HitShadeContext sc;
        EXPECT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(x, y), sc));
        return sc.UVW(1);
    };
    for (auto [x, y] : {std::pair{100.5f, 100.5f}, {130.5f, 80.5f}, {70.5f, 125.5f}}) {
        HitShadeContext sc;
        ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(x, y), sc));
        // UV from the world position of the hit.
        const Point3 w = sc.PointTo(sc.P(), REF_WORLD);
        EXPECT_NEAR(w.length(), 1, 1e-4f);
        float phi = std::atan2(w.y, w.x);
        if (phi < 0) phi += 2 * kPi;
        EXPECT_NEAR(sc.UVW(1).x, phi / (2 * kPi), 1e-4f);
        EXPECT_NEAR(sc.UVW(1).y, 1 - std::acos(w.z) / kPi, 1e-4f);
        // Screen derivatives against central differences; the differentials reach a whole
        // pixel across the tangent plane, so they agree to first order.
        Point3 dx, dy;
        sc.UVWDerivatives(1, dx, dy);
        const Point3 fdx = (uvAt(x + 0.05f, y) - uvAt(x - 0.05f, y)) / 0.1f;
        const Point3 fdy = (uvAt(x, y - 0.05f) - uvAt(x, y + 0.05f)) / 0.1f;
        EXPECT_NEAR(dx.x, fdx.x, 1.5e-2f * std::fabs(fdx.x) + 1e-5f);
        EXPECT_NEAR(dx.y, fdx.y, 1.5e-2f * std::fabs(fdx.y) + 1e-5f);
        EXPECT_NEAR(dy.x, fdy.x, 1.5e-2f * std::fabs(fdy.x) + 1e-5f);
        EXPECT_NEAR(dy.y, fdy.y, 1.5e-2f * std::fabs(fdy.y) + 1e-5f);
        // The normal is the outward radius; the geometric one agrees on a sphere.
        ExpectNear(sc.VectorTo(sc.Normal(), REF_WORLD), w, 1e-4f);
        ExpectNear(sc.Normal(), sc.GNormal(), 1e-5f);
        EXPECT_FALSE(sc.BackFace());
    }
}

TEST(HitShadeContext, BackFaceWhenSeenFromBelow) {
    Prepared p(PlaneScene(false, -10));
    HitShadeContext sc;
    ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(40.5f, 20.5f), sc));
    EXPECT_TRUE(sc.BackFace());
    // Normals stay the surface's own: +Z in the world.
    ExpectNear(sc.VectorTo(sc.GNormal(), REF_WORLD), Point3(0, 0, 1));
    ExpectNear(sc.VectorTo(sc.Normal(), REF_WORLD), Point3(0, 0, 1));
    EXPECT_GT(sc.V().dot(sc.GNormal()), 0);
    Prepared above(PlaneScene(false, 10));
    ASSERT_TRUE(above.renderer.HitContext(above.renderer.MakeCameraRay(40.5f, 20.5f), sc));
    EXPECT_FALSE(sc.BackFace());
}

TEST(HitShadeContext, FramesComposeToTheNodeTransform) {
    auto scene = PlaneScene(true, 10);
    INode* node = scene->FindNode(L"Plane");
    const Matrix3 tm = ScaleMatrix(Point3(2, 1.5f, 1)) * RotateXYZMatrix(Point3(0, 0, 30)) *
                       TransMatrix(Point3(0.5f, 0.2f, 1));
    node->SetObjectTM(tm);
    Prepared p(std::move(scene));
    HitShadeContext sc;
    ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(41.5f, 19.5f), sc));
    const Point3 world = sc.PointTo(sc.P(), REF_WORLD);
    const Point3 object = sc.PointTo(sc.P(), REF_OBJECT);
    EXPECT_NEAR(world.z, 1, 1e-4f);
    EXPECT_NEAR(object.z, 0, 1e-4f);
    ExpectNear(tm.PointTransform(object), world);
    ExpectNear(sc.PointFrom(world, REF_WORLD), sc.P());
    ExpectNear(sc.PointFrom(object, REF_OBJECT), sc.P());
    ExpectNear(sc.PointTo(sc.P(), REF_CAMERA), sc.P());
    const Matrix3 objToWorld = sc.MatrixFrom(REF_OBJECT) * sc.MatrixTo(REF_WORLD);
    for (int r = 0; r < 4; ++r) ExpectNear(objToWorld.GetRow(r), tm.GetRow(r));
    const Point3 v(0.3f, -0.2f, 0.9f);
    ExpectNear(sc.VectorFrom(sc.VectorTo(v, REF_OBJECT), REF_OBJECT), v);
    ExpectNear(sc.MatrixTo(REF_WORLD).VectorTransform(v), sc.VectorTo(v, REF_WORLD));
    // The object frame's U axis is the node's rotated, scaled X axis.
    Point3 dp[3];
    sc.DPdUVW(dp, 1);
    ExpectNear(sc.VectorTo(dp[0], REF_WORLD), tm.VectorTransform(Point3(4, 0, 0)), 1e-3f);
    Point3 basis[2];
    ASSERT_TRUE(sc.BumpBasisVectors(basis, 0, 1));
    ExpectNear(basis[0], dp[0].normalized(), 1e-4f);
    EXPECT_NEAR(basis[0].dot(sc.Normal()), 0, 1e-5f);
    EXPECT_EQ(sc.Node(), p.scene->FindNode(L"Plane"));
    EXPECT_EQ(sc.NodeID(), 0);
    EXPECT_EQ(sc.GetEvalObject(), sc.Node()->GetObjectRef());
}

TEST(HitShadeContext, MappingChannelsScaleCoordinatesAndDerivatives) {
    auto scene = PlaneScene(false);
    ChannelMapping m;
    m.scale = Point3(2, 4, 1);
    m.offset = Point3(0.5f, 0, 0);
    scene->FindNode(L"Plane")->GetObjectRef()->SetChannel(2, m);
    Prepared p(std::move(scene));
    HitShadeContext sc;
    ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(40.5f, 20.5f), sc));
    const Point3 uv1 = sc.UVW(1);
    ExpectNear(sc.UVW(2), Point3(uv1.x * 2 + 0.5f, uv1.y * 4, 0));
    ExpectNear(sc.DUVW(2), Point3(0.05f, 0.2f, 0), 1e-5f);
    Point3 dp1[3], dp2[3];
    sc.DPdUVW(dp1, 1);
    sc.DPdUVW(dp2, 2);
    ExpectNear(dp2[0], dp1[0] / 2);
    ExpectNear(dp2[1], dp1[1] / 4);
    ExpectNear(sc.UVW(3), Point3(0, 0, 0));
    ExpectNear(sc.DUVW(3), Point3(0, 0, 0));
    Point3 basis[2];
    EXPECT_FALSE(sc.BumpBasisVectors(basis, 0, 3));
}

TEST(HitShadeContext, PerSampleCacheIsClearedForEachSample) {
    Prepared p(PlaneScene(false));
    HitShadeContext sc;
    ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(40.5f, 20.5f), sc));
    int key = 0;
    sc.PutCache(reinterpret_cast<const Texmap*>(&key), AColor(1, 2, 3, 4));
    sc.PutCache(reinterpret_cast<const Texmap*>(&key), 0.5f);
    AColor c(0, 0, 0, 0);
    float f = 0;
    Point3 v(0, 0, 0);
    EXPECT_TRUE(sc.GetCache(reinterpret_cast<const Texmap*>(&key), c));
    EXPECT_EQ(c, AColor(1, 2, 3, 4));
    EXPECT_TRUE(sc.GetCache(reinterpret_cast<const Texmap*>(&key), f));
    EXPECT_EQ(f, 0.5f);
    EXPECT_FALSE(sc.GetCache(reinterpret_cast<const Texmap*>(&key), v)); // per kind
    ASSERT_TRUE(p.renderer.HitContext(p.renderer.MakeCameraRay(41.5f, 20.5f), sc));
    EXPECT_FALSE(sc.GetCache(reinterpret_cast<const Texmap*>(&key), c));
}
