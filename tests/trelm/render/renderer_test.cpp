#include <trelm/core/notifications.h>
#include <trelm/render/renderer.h>
#include <trelm/scene/primitives.h>
#include <trelm/scene/scene_file.h>

#include <OpenImageIO/imagebuf.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <filesystem>

using namespace TrelmSDK;

namespace {

const std::string kTexture = std::string(TESSEL_SOURCE_DIR) + "/examples/textures/tiles.png";

std::unique_ptr<Scene> SmallBuiltin(int w = 96, int h = 72) {
    auto scene = MakeBuiltinScene(kTexture);
    scene->settings.width = w;
    scene->settings.height = h;
    return scene;
}

RenderImage RenderWith(int threads, Scene& scene) {
    Renderer r(threads);
    RenderImage image;
    std::string error;
    EXPECT_TRUE(r.Render(scene, image, nullptr, error)) << error;
    return image;
}

struct Log {
    std::vector<int> codes;
};
void Record(void* param, NotifyInfo* info) {
    static_cast<Log*>(param)->codes.push_back(info->intcode);
}

} // namespace

TEST(Renderer, OneThreadAndManyThreadsGiveTheSameImage) {
    auto scene = SmallBuiltin();
    scene->settings.samplesPerAxis = 2;
    const RenderImage one = RenderWith(1, *scene);
    const RenderImage all = RenderWith(0, *scene);
    const RenderImage four = RenderWith(4, *scene);
    ASSERT_EQ(one.pixels.size(), size_t(96 * 72 * 4));
    ASSERT_EQ(all.pixels.size(), one.pixels.size());
    EXPECT_EQ(std::memcmp(one.pixels.data(), all.pixels.data(), one.pixels.size() * sizeof(float)),
              0);
    EXPECT_EQ(std::memcmp(one.pixels.data(), four.pixels.data(), one.pixels.size() * sizeof(float)),
              0);
    // The sphere is in the middle, lit and textured; the top corners show the background.
    const AColor centre = one.At(48, 30);
    EXPECT_EQ(centre.a, 1);
    EXPECT_GT(centre.r + centre.g + centre.b, 0.05f);
    EXPECT_EQ(one.At(0, 0).a, 0);
}

TEST(Renderer, MapsSwitchedOffLeaveTheMaterialColour) {
    auto scene = SmallBuiltin(32, 24);
    for (Light& l : scene->lights) l.color = Color(1, 1, 1);
    scene->settings.mapsEnabled = false;
    scene->FindMaterial("Floor")->diffuse = Color(0.5f, 0.5f, 0.5f);
    const RenderImage image = RenderWith(1, *scene);
    // Grey material, white lights: a floor pixel is grey. With the checker on (dark cells are
    // bluish) it would not be.
    const AColor floor = image.At(2, 22);
    EXPECT_EQ(floor.a, 1);
    EXPECT_FLOAT_EQ(floor.r, floor.g);
    EXPECT_FLOAT_EQ(floor.r, floor.b);
    Renderer r(1);
    std::string error;
    ASSERT_TRUE(r.Prepare(*scene, error));
    HitShadeContext sc;
    ASSERT_TRUE(r.HitContext(r.MakeCameraRay(2.5f, 22.5f), sc));
    EXPECT_FALSE(sc.doMaps);
}

TEST(Renderer, SendsChangedNodesThenPreRender) {
    auto scene = SmallBuiltin(16, 12);
    Log log;
    RegisterNotification(Record, &log, NOTIFY_NODES_CHANGED);
    RegisterNotification(Record, &log, NOTIFY_PRE_RENDER);
    RenderWith(1, *scene);
    scene->FindNode(L"Sphere001")->SetWireColor(0x00FF00);
    RenderWith(1, *scene);
    RenderWith(1, *scene); // nothing changed: no 132
    UnRegisterNotification(Record, &log);
    EXPECT_EQ(log.codes, (std::vector<int>{132, 57, 132, 57, 57}));
}

TEST(Renderer, RegionsRenderOnlyTheirPixels) {
    auto scene = SmallBuiltin(64, 48);
    const RenderImage full = RenderWith(2, *scene);
    scene->settings.type = RENDTYPE_REGION_CROP;
    scene->settings.region = {0.25f, 0.5f, 0.75f, 1.0f};
    const RenderImage crop = RenderWith(2, *scene);
    ASSERT_EQ(crop.width, 32);
    ASSERT_EQ(crop.height, 24);
    for (int y = 0; y < 24; ++y)
        for (int x = 0; x < 32; ++x)
            ASSERT_EQ(crop.At(x, y), full.At(x + 16, y + 24)) << x << "," << y;
    scene->settings.type = RENDTYPE_REGION;
    const RenderImage region = RenderWith(2, *scene);
    ASSERT_EQ(region.width, 64);
    EXPECT_EQ(region.At(20, 30), full.At(20, 30));
    EXPECT_EQ(region.At(5, 5), AColor(0, 0, 0, 0)); // outside: left clear
}

TEST(Renderer, ProgressCanCancelAndBadSettingsAreRefused) {
    auto scene = SmallBuiltin(256, 256);
    Renderer r(1);
    RenderImage image;
    std::string error;
    int calls = 0;
    EXPECT_FALSE(r.Render(
        *scene, image, [&](int, int) { return ++calls < 1; }, error));
    EXPECT_NE(error.find("cancelled"), std::string::npos);
    int last = -1, total = 0;
    ASSERT_TRUE(r.Render(
        *scene, image, [&](int d, int t) { return last = d, total = t, true; }, error));
    EXPECT_EQ(last, total);
    EXPECT_EQ(total, 64); // 256 / 32 squared
    scene->settings.width = 0;
    EXPECT_FALSE(r.Render(*scene, image, nullptr, error));
    EXPECT_NE(error.find("output size"), std::string::npos);
}

TEST(Renderer, IntersectionQueryAndTraceMeasureDistances) {
    auto scene = SmallBuiltin(80, 60);
    Renderer r(1);
    std::string error;
    ASSERT_TRUE(r.Prepare(*scene, error)) << error;
    // A ray straight down from above the sphere, given in the camera frame.
    const Ray world{Point3(0, 0, 5), Point3(0, 0, -2)};
    const Ray cam{r.worldToCam.PointTransform(world.p), r.worldToCam.VectorTransform(world.dir)};
    std::vector<IntersectionHit> hits;
    ASSERT_EQ(r.IntersectWorld(cam, 0, hits), 2);
    EXPECT_NEAR(hits[0].dist, 3, 1e-3f); // the sphere's top at z = 2
    EXPECT_EQ(hits[0].node, scene->FindNode(L"Sphere001"));
    EXPECT_NEAR(hits[1].dist, 5, 1e-3f); // the plane
    ASSERT_EQ(r.IntersectWorld(cam, scene->FindNode(L"Sphere001")->GetHandle(), hits), 1);
    EXPECT_EQ(hits[0].node, scene->FindNode(L"Plane001"));

    // Trace from a floor point towards the sphere's centre and straight up past it.
    HitShadeContext sc;
    ASSERT_TRUE(r.HitContext(r.MakeCameraRay(8.5f, 52.5f), sc));
    auto* tracer = static_cast<IRayTrace*>(sc.GetInterface(IRAYTRACE_INTERFACE_ID));
    ASSERT_TRUE(tracer);
    ASSERT_EQ(sc.globContext, static_cast<RenderGlobalContext*>(&r));
    const Point3 from = sc.PointTo(sc.P(), REF_WORLD);
    const Point3 toCentre = Point3(0, 0, 1) - from;
    TraceRecord rec;
    ASSERT_TRUE(tracer->TraceRay(sc, sc.P(), sc.VectorFrom(toCentre, REF_WORLD), 0.001f, 100, true,
                                 nullptr, rec));
    EXPECT_NEAR(rec.hitDist, toCentre.length() - 1, 1e-3f);
    const Point3 hitP(rec.P[0], rec.P[1], rec.P[2]), hitN(rec.N[0], rec.N[1], rec.N[2]);
    EXPECT_NEAR((hitP - Point3(0, 0, 1)).length(), 1, 1e-3f);
    EXPECT_NEAR((hitN - (hitP - Point3(0, 0, 1))).length(), 0, 1e-3f);
    EXPECT_GT(rec.color[0] + rec.color[1] + rec.color[2], 0);
    // Not far enough: the limit is honoured and the record says "no hit".
    EXPECT_FALSE(tracer->TraceRay(sc, sc.P(), sc.VectorFrom(toCentre, REF_WORLD), 0.001f,
                                  toCentre.length() - 1.5f, false, nullptr, rec));
    EXPECT_EQ(rec.hitDist, 0);
    // Straight up from a floor point away from the sphere: nothing there.
    ASSERT_GT(std::hypot(from.x, from.y), 1.05f);
    EXPECT_FALSE(tracer->TraceRay(sc, sc.P(), sc.VectorFrom(Point3(0, 0, 1), REF_WORLD), 0.001f,
                                  100, true, nullptr, rec));
    EXPECT_EQ(rec.hitDist, 0);
}

TEST(RenderImage, WritesLinearFloatsAndDisplayEncodedBytes) {
    RenderImage image;
    image.Resize(2, 1);
    image.Set(0, 0, AColor(0.21404f, 0.5f, 1.0f, 1.0f));
    image.Set(1, 0, AColor(0, 0, 0, 0.5f));
    const auto dir = std::filesystem::temp_directory_path();
    std::string error;
    const std::string exr = (dir / "trelm_render.exr").string();
    ASSERT_TRUE(image.Write(exr, error)) << error;
    OIIO::ImageBuf in(exr);
    float px[4];
    in.getpixel(0, 0, px, 4);
    EXPECT_NEAR(px[0], 0.21404f, 1e-6f);
    const std::string png = (dir / "trelm_render.png").string();
    ASSERT_TRUE(image.Write(png, error)) << error;
    OIIO::ImageBuf inPng(png);
    inPng.getpixel(0, 0, px, 4);
    EXPECT_NEAR(px[0], 0.5f, 1.0f / 255); // sRGB encoded for display
    EXPECT_FALSE(image.Write((dir / "trelm_render.unknownformat").string(), error));
    EXPECT_FALSE(error.empty());
    RenderImage empty;
    EXPECT_FALSE(empty.Write(png, error));
}
