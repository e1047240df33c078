#include <trelm/scene/particle_system.h>
#include <trelm/scene/primitives.h>
#include <trelm/scene/tri_mesh.h>

#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <fstream>

using namespace TrelmSDK;

namespace {

constexpr float kPi = 3.14159265358979f;

void ExpectNear(const Point3& a, const Point3& b, float eps = 1e-4f) {
    EXPECT_NEAR(a.x, b.x, eps);
    EXPECT_NEAR(a.y, b.y, eps);
    EXPECT_NEAR(a.z, b.z, eps);
}

std::string WriteTemp(const std::string& name, const std::string& text) {
    const auto path = std::filesystem::temp_directory_path() / name;
    std::ofstream(path) << text;
    return path.string();
}

} // namespace

TEST(PlaneObject, UVsAndDerivativesFollowThePosition) {
    PlaneObject plane(4, 2);
    SurfaceHit hit;
    ASSERT_TRUE(plane.Intersect(Ray{Point3(1, 0.5f, 3), Point3(0, 0, -1)}, 0, 100, hit));
    EXPECT_FLOAT_EQ(hit.t, 3);
    ExpectNear(hit.uvw, Point3(0.75f, 0.75f, 0));
    ExpectNear(hit.dpdu, Point3(4, 0, 0));
    ExpectNear(hit.dpdv, Point3(0, 2, 0));
    ExpectNear(hit.ng, Point3(0, 0, 1));
    EXPECT_FALSE(plane.Intersect(Ray{Point3(2.5f, 0, 3), Point3(0, 0, -1)}, 0, 100, hit));
    EXPECT_FALSE(plane.Intersect(Ray{Point3(0, 0, 3), Point3(0, 0, -1)}, 0, 2.5f, hit));
    EXPECT_FALSE(plane.Intersect(Ray{Point3(0, 0, 3), Point3(1, 0, 0)}, 0, 100, hit));
}

TEST(SphereObject, UVsMatchLongitudeAndLatitude) {
    SphereObject sphere(2);
    SurfaceHit hit;
    // Straight down onto the +Y side at 30 degrees above the equator.
    const float lat = kPi / 6;
    const Point3 target(0, 2 * std::cos(lat), 2 * std::sin(lat));
    ASSERT_TRUE(sphere.Intersect(Ray{target * 3.0f, -target}, 0, 100, hit));
    ExpectNear(hit.p, target);
    EXPECT_NEAR(hit.uvw.x, 0.25f, 1e-5f);           // 90 degrees of longitude
    EXPECT_NEAR(hit.uvw.y, 0.5f + 1.0f / 6, 1e-5f); // 30 of 180 degrees above the equator
    ExpectNear(hit.n, target / 2);
    // dP/du and dP/dv against finite differences of the parameterisation.
    auto at = [](float u, float v) {
        const float phi = 2 * kPi * u, theta = kPi * (1 - v);
        return Point3(std::cos(phi) * std::sin(theta), std::sin(phi) * std::sin(theta),
                      std::cos(theta)) *
               2.0f;
    };
    const float h = 1e-3f;
    const Point3 du = (at(hit.uvw.x + h, hit.uvw.y) - at(hit.uvw.x - h, hit.uvw.y)) / (2 * h);
    const Point3 dv = (at(hit.uvw.x, hit.uvw.y + h) - at(hit.uvw.x, hit.uvw.y - h)) / (2 * h);
    ExpectNear(hit.dpdu, du, 2e-2f);
    ExpectNear(hit.dpdv, dv, 2e-2f);
}

TEST(SphereObject, RayFromInsideHitsTheFarSide) {
    SphereObject sphere(1);
    SurfaceHit hit;
    ASSERT_TRUE(sphere.Intersect(Ray{Point3(0, 0, 0), Point3(1, 0, 0)}, 1e-4f, 100, hit));
    EXPECT_NEAR(hit.t, 1, 1e-5f);
    ExpectNear(hit.ng, Point3(1, 0, 0)); // outward, so the renderer sees a back face
}

TEST(BoxObject, FacesReportTheirNumberAndUVs) {
    BoxObject box(Point3(2, 4, 6));
    SurfaceHit hit;
    ASSERT_TRUE(box.Intersect(Ray{Point3(0.5f, 1, 10), Point3(0, 0, -1)}, 0, 100, hit));
    EXPECT_FLOAT_EQ(hit.t, 7);
    ExpectNear(hit.ng, Point3(0, 0, 1));
    EXPECT_EQ(hit.face, 5);
    EXPECT_EQ(hit.mtlNum, 5);
    ExpectNear(hit.uvw, Point3(0.75f, 0.75f, 0));
    // U, V and the normal form a right-handed frame on every face.
    for (const Point3& dir : {Point3(1, 0, 0), Point3(-1, 0, 0), Point3(0, 1, 0), Point3(0, -1, 0),
                              Point3(0, 0, 1), Point3(0, 0, -1)}) {
        ASSERT_TRUE(box.Intersect(Ray{dir * -20.0f, dir}, 0, 100, hit));
        EXPECT_GT(hit.dpdu.cross(hit.dpdv).dot(hit.ng), 0);
        ExpectNear(hit.ng, -dir);
    }
}

TEST(TriMesh, OBJWithUVsGivesInterpolatedCoordinates) {
    const std::string path = WriteTemp("trelm_quad.obj", "v 0 0 0\nv 2 0 0\nv 2 2 0\nv 0 2 0\n"
                                                         "vt 0 0\nvt 1 0\nvt 1 1\nvt 0 1\n"
                                                         "f 1/1 2/2 3/3 4/4\n");
    std::string error;
    auto mesh = TriMesh::LoadOBJ(path, error);
    ASSERT_TRUE(mesh) << error;
    EXPECT_EQ(mesh->triangles.size(), 2u);
    SurfaceHit hit;
    ASSERT_TRUE(mesh->Intersect(Ray{Point3(0.5f, 1.5f, 1), Point3(0, 0, -1)}, 0, 10, hit));
    ExpectNear(hit.uvw, Point3(0.25f, 0.75f, 0));
    ExpectNear(hit.dpdu, Point3(2, 0, 0));
    ExpectNear(hit.dpdv, Point3(0, 2, 0));
    ExpectNear(hit.ng, Point3(0, 0, 1));
}

TEST(TriMesh, ManyTrianglesThroughTheHierarchy) {
    // A 40 x 40 grid: every ray must find the triangle under it.
    TriMesh mesh;
    const int n = 40;
    for (int j = 0; j <= n; ++j)
        for (int i = 0; i <= n; ++i) {
            mesh.positions.push_back(Point3(float(i), float(j), 0.1f * float((i + j) % 3)));
            mesh.uvs.push_back(Point3(float(i) / n, float(j) / n, 0));
        }
    for (int j = 0; j < n; ++j)
        for (int i = 0; i < n; ++i) {
            const int a = j * (n + 1) + i, b = a + 1, c = a + n + 2, d = a + n + 1;
            mesh.triangles.push_back({{a, b, c}, {a, b, c}, {-1, -1, -1}, 0});
            mesh.triangles.push_back({{a, c, d}, {a, c, d}, {-1, -1, -1}, 0});
        }
    std::string error;
    ASSERT_TRUE(mesh.Build(error)) << error;
    for (int k = 0; k < 200; ++k) {
        const float x = 0.37f + float(k % 39), y = 0.61f + float((k * 7) % 39);
        SurfaceHit hit;
        ASSERT_TRUE(mesh.Intersect(Ray{Point3(x, y, 5), Point3(0, 0, -1)}, 0, 100, hit)) << k;
        EXPECT_NEAR(hit.uvw.x, x / n, 1e-4f);
        EXPECT_NEAR(hit.uvw.y, y / n, 1e-4f);
    }
}

TEST(TriMesh, BadFilesAreReportedWithTheirLine) {
    std::string error;
    EXPECT_FALSE(TriMesh::LoadOBJ("/nonexistent/mesh.obj", error));
    EXPECT_NE(error.find("cannot open"), std::string::npos);
    const std::string bad = WriteTemp("trelm_bad.obj", "v 0 0 0\nv 1 0 0\nf 1 2 7\n");
    EXPECT_FALSE(TriMesh::LoadOBJ(bad, error));
    EXPECT_NE(error.find(":3:"), std::string::npos) << error;
    const std::string empty = WriteTemp("trelm_empty.obj", "v 0 0 0\n");
    EXPECT_FALSE(TriMesh::LoadOBJ(empty, error));
    EXPECT_NE(error.find("no faces"), std::string::npos);
    const std::string junk = WriteTemp("trelm_junk.obj", "v 0 zero 0\n");
    EXPECT_FALSE(TriMesh::LoadOBJ(junk, error));
}

TEST(ParticleSystem, AgeAndLifeFollowBirthTimes) {
    ParticleSystem::Params p;
    p.count = 10;
    p.emitStart = 0;
    p.emitStop = 4800;
    p.life = 2400;
    p.lifeVariation = 0;
    ParticleSystem ps(p);
    EXPECT_EQ(ps.NumParticles(), 10);
    // Particle 5 is born at half a second.
    EXPECT_EQ(ps.GetParticleAge(2400, 5), 0); // just born
    EXPECT_EQ(ps.GetParticleAge(2399, 5), -1);
    EXPECT_EQ(ps.GetParticleAge(3600, 5), 1200);
    EXPECT_EQ(ps.GetParticleLife(3600, 5), 2400);
    EXPECT_EQ(ps.GetParticleAge(2400 + 2400, 5), -1); // dead at the end of its life
    EXPECT_EQ(ps.GetParticleAge(0, 42), -1);
    ps.Update(3600);
    SurfaceHit hit;
    const Point3 pos = ps.GetParticlePosition(3600, 5);
    ASSERT_TRUE(ps.Intersect(Ray{pos + Point3(0, 0, 5), Point3(0, 0, -1)}, 0, 100, hit));
    // The hit reports the index of the particle it lies on (perhaps one above particle 5).
    ASSERT_GE(ps.GetParticleAge(3600, hit.mtlNum), 0);
    EXPECT_NEAR((hit.p - ps.GetParticlePosition(3600, hit.mtlNum)).length(), p.size, 1e-4f);
    // Dead particles are not there to hit.
    ps.Update(20000);
    EXPECT_FALSE(ps.Intersect(Ray{pos + Point3(0, 0, 5), Point3(0, 0, -1)}, 0, 100, hit));
}
