#include "test_context.h"

#include <trelm/scene/bitmap_tex.h>
#include <trelm/scene/checker_tex.h>
#include <trelm/scene/color_pipeline.h>
#include <trelm/scene/gradient_tex.h>

#include <OpenImageIO/imageio.h>
#include <gtest/gtest.h>

#include <atomic>
#include <filesystem>
#include <thread>

using namespace TrelmSDK;
using trelm_test::FixedContext;

namespace {

// A 4 x 4 float image whose pixel (x, y) holds (x / 4, y / 4, 0.5, 1 - x / 8).
std::string WriteGridImage() {
    const auto path = std::filesystem::temp_directory_path() / "trelm_grid.exr";
    float data[4 * 4 * 4];
    for (int y = 0; y < 4; ++y)
        for (int x = 0; x < 4; ++x) {
            float* p = &data[(y * 4 + x) * 4];
            p[0] = x / 4.0f, p[1] = y / 4.0f, p[2] = 0.5f, p[3] = 1 - x / 8.0f;
        }
    auto out = OIIO::ImageOutput::create(path.string());
    OIIO::ImageSpec spec(4, 4, 4, OIIO::TypeDesc::FLOAT);
    EXPECT_TRUE(out && out->open(path.string(), spec) &&
                out->write_image(OIIO::TypeDesc::FLOAT, data) && out->close());
    return path.string();
}

AColor At(Texmap& map, float u, float v) {
    FixedContext sc;
    sc.uvw = Point3(u, v, 0);
    return map.EvalColor(sc);
}

class CountingChecker : public CheckerTex {
public:
    std::atomic<int> lookups{0};
    AColor Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx, const Point2& dy) override {
        ++lookups;
        return CheckerTex::Lookup(sc, uv, dx, dy);
    }
};

} // namespace

TEST(BitmapTex, PixelCentresGiveThePixelValues) {
    BitmapTex map;
    map.SetFileName(WriteGridImage());
    map.colorSpace = "raw";
    for (auto filter : {BitmapTex::Filter::Closest, BitmapTex::Filter::Bilinear}) {
        map.filter = filter;
        Interval valid = FOREVER;
        map.Update(0, valid);
        ASSERT_TRUE(map.IsLoaded()) << map.LastError();
        EXPECT_EQ(map.Channels(), 4);
        for (int y = 0; y < 4; ++y)
            for (int x = 0; x < 4; ++x) {
                // V runs up while image rows run down.
                const AColor c = At(map, (x + 0.5f) / 4, 1 - (y + 0.5f) / 4);
                EXPECT_NEAR(c.r, x / 4.0f, 1e-5f) << x << "," << y;
                EXPECT_NEAR(c.g, y / 4.0f, 1e-5f) << x << "," << y;
                EXPECT_NEAR(c.b, 0.5f, 1e-5f);
                EXPECT_NEAR(c.a, 1 - x / 8.0f, 1e-5f);
            }
    }
}

TEST(BitmapTex, BilinearBlendsNeighboursAndTilingWraps) {
    BitmapTex map;
    map.SetFileName(WriteGridImage());
    map.colorSpace = "raw";
    map.filter = BitmapTex::Filter::Bilinear;
    Interval valid = FOREVER;
    map.Update(0, valid);
    ASSERT_TRUE(map.IsLoaded()) << map.LastError();
    // Halfway between columns 1 and 2.
    EXPECT_NEAR(At(map, 0.5f, 1 - 0.625f).r, 0.375f, 1e-5f);
    // Tiled: one tile to the right is the same place.
    EXPECT_NEAR(At(map, 1.125f, 0.875f).r, 0.0f, 1e-5f);
    EXPECT_NEAR(At(map, -0.875f, 0.875f).r, 0.0f, 1e-5f);
    // Clamped: beyond the right edge stays on the last column.
    map.tileU = false;
    EXPECT_NEAR(At(map, 1.125f, 0.875f).r, 0.75f, 1e-5f);
    // The map's tiling repeats the image twice across U.
    map.tileU = true;
    map.uvGen.uTiling = 2;
    EXPECT_NEAR(At(map, 0.5f + 0.0625f, 0.875f).r, 0.0f, 1e-5f);
}

TEST(BitmapTex, EightBitSRGBIsConvertedToTheRenderingSpace) {
    const auto path = (std::filesystem::temp_directory_path() / "trelm_grey.png").string();
    unsigned char px[3] = {128, 128, 128};
    auto out = OIIO::ImageOutput::create(path);
    ASSERT_TRUE(out && out->open(path, OIIO::ImageSpec(1, 1, 3, OIIO::TypeDesc::UINT8)) &&
                out->write_image(OIIO::TypeDesc::UINT8, px) && out->close());
    ColorPipelineManager& cm = GetColorPipelineMgr();
    const bool wasActive = cm.IsColorManagementActive();
    const std::string wasSpace = cm.RenderingSpace();
    cm.SetColorManagementActive(true);
    cm.SetRenderingSpace("linear");
    BitmapTex map;
    map.SetFileName(path);
    Interval valid = FOREVER;
    map.Update(0, valid);
    ASSERT_TRUE(map.IsLoaded()) << map.LastError();
    const AColor c = At(map, 0.5f, 0.5f);
    EXPECT_NEAR(c.r, 0.2158f, 2e-3f); // sRGB 128/255 decoded
    EXPECT_NEAR(c.a, 1.0f, 1e-6f);
    // Read as raw, the stored value comes through.
    BitmapTex raw;
    raw.SetFileName(path);
    raw.colorSpace = "raw";
    raw.Update(0, valid);
    EXPECT_NEAR(At(raw, 0.5f, 0.5f).r, 128 / 255.0f, 2e-3f);
    cm.SetColorManagementActive(wasActive);
    cm.SetRenderingSpace(wasSpace);
}

TEST(BitmapTex, MissingFileIsReportedAndEvaluatesTransparentBlack) {
    BitmapTex map;
    map.SetFileName("/nonexistent/texture.png");
    Interval valid = FOREVER;
    map.Update(0, valid);
    EXPECT_FALSE(map.IsLoaded());
    EXPECT_NE(map.LastError().find("/nonexistent/texture.png"), std::string::npos);
    const AColor c = At(map, 0.5f, 0.5f);
    EXPECT_EQ(c.r, 0);
    EXPECT_EQ(c.a, 0);
}

TEST(CheckerTex, CellsAlternateAndWideFootprintsAverage) {
    CheckerTex map;
    map.color1 = AColor(0, 0, 0, 1);
    map.color2 = AColor(1, 1, 1, 1);
    EXPECT_EQ(At(map, 0.25f, 0.25f).r, 0);
    EXPECT_EQ(At(map, 0.75f, 0.25f).r, 1);
    EXPECT_EQ(At(map, 0.75f, 0.75f).r, 0);
    EXPECT_EQ(At(map, 1.25f, 0.25f).r, 0); // tiles repeat
    FixedContext sc;
    sc.uvw = Point3(0.3f, 0.3f, 0);
    sc.ddx = Point3(3, 0, 0), sc.ddy = Point3(0, 3, 0);
    EXPECT_NEAR(map.EvalColor(sc).r, 0.5f, 1e-4f);
    // A footprint straddling one vertical edge in the middle of a row: half and half.
    FixedContext edge;
    edge.uvw = Point3(0.5f, 0.25f, 0);
    edge.ddx = Point3(0.1f, 0, 0), edge.ddy = Point3(0, 0.1f, 0);
    EXPECT_NEAR(map.EvalColor(edge).r, 0.5f, 1e-4f);
}

TEST(CheckerTex, SubMapsReplaceTheirColour) {
    CheckerTex map;
    GradientTex inner;
    inner.color1 = inner.color2 = inner.color3 = AColor(0.2f, 0.4f, 0.6f, 1);
    map.SetSubTexmap(1, &inner);
    EXPECT_EQ(map.GetSubTexmap(1), &inner);
    EXPECT_EQ(map.GetSubTexmapSlotName(1), L"Color 2");
    EXPECT_NEAR(At(map, 0.75f, 0.25f).g, 0.4f, 1e-6f);
    EXPECT_EQ(At(map, 0.25f, 0.25f).g, 0); // the other cell keeps its colour
}

TEST(GradientTex, ThreeColoursAlongVAndRadially) {
    GradientTex map;
    map.color1 = AColor(0, 0, 0, 1);
    map.color2 = AColor(1, 0, 0, 1);
    map.color3 = AColor(1, 1, 1, 1);
    map.color2Pos = 0.25f;
    EXPECT_NEAR(At(map, 0.3f, 0.125f).r, 0.5f, 1e-5f);
    EXPECT_NEAR(At(map, 0.3f, 0.25f).r, 1.0f, 1e-5f);
    EXPECT_NEAR(At(map, 0.3f, 0.625f).g, 0.5f, 1e-5f);
    map.type = GradientTex::Type::Radial;
    EXPECT_NEAR(At(map, 0.5f, 0.5f).r, 0.0f, 1e-5f);
    EXPECT_NEAR(At(map, 0.5f, 1.0f - 1e-6f).g, 1.0f, 1e-4f);
}

TEST(MappedTexmap, BumpTiltsTheNormalDownhill) {
    GradientTex ramp; // mono rises with V: 0 at the bottom, 1 at the top
    ramp.color1 = AColor(0, 0, 0, 1);
    ramp.color2 = AColor(0.5f, 0.5f, 0.5f, 1);
    ramp.color3 = AColor(1, 1, 1, 1);
    FixedContext sc;
    sc.uvw = Point3(0.5f, 0.3f, 0);
    sc.dpdu = Point3(2, 0, 0);
    sc.dpdv = Point3(0, 4, 0); // one V unit spans four world units
    const Point3 d = ramp.EvalNormalPerturb(sc);
    EXPECT_NEAR(d.x, 0, 1e-4f);
    EXPECT_NEAR(d.y, -0.25f, 1e-3f);
    EXPECT_NEAR(d.z, 0, 1e-6f);
}

TEST(MappedTexmap, PerSampleCacheEvaluatesOncePerSample) {
    CountingChecker map;
    FixedContext sc;
    sc.uvw = Point3(0.75f, 0.25f, 0);
    const AColor a = map.EvalColor(sc);
    const AColor b = map.EvalColor(sc);
    EXPECT_EQ(map.lookups, 1);
    EXPECT_EQ(a, b);
    // Another map asking the same context has its own entry.
    CountingChecker other;
    other.color2 = AColor(0, 1, 0, 1);
    EXPECT_EQ(other.EvalColor(sc).g, 1);
    EXPECT_EQ(map.EvalColor(sc).r, 1);
    EXPECT_EQ(map.lookups, 1);
    // A new sample starts with an empty cache.
    sc.ClearCache();
    sc.uvw = Point3(0.25f, 0.25f, 0);
    EXPECT_EQ(map.EvalColor(sc).r, 0);
    EXPECT_EQ(map.lookups, 2);
}

TEST(SampleCache, KeepsValuesPerKeyAndEvictsWhenFull) {
    SampleCache<float, 4> cache;
    int keys[6];
    for (int i = 0; i < 6; ++i) cache.Put(&keys[i], float(i));
    EXPECT_EQ(cache.Size(), 4);
    float v = -1;
    EXPECT_TRUE(cache.Get(&keys[5], v));
    EXPECT_EQ(v, 5);
    cache.Put(&keys[5], 50);
    EXPECT_TRUE(cache.Get(&keys[5], v));
    EXPECT_EQ(v, 50);
    cache.Clear();
    EXPECT_FALSE(cache.Get(&keys[5], v));
}

TEST(BitmapTex, ConcurrentLookupsAgree) {
    BitmapTex map;
    map.SetFileName(WriteGridImage());
    map.colorSpace = "raw";
    map.filter = BitmapTex::Filter::Bilinear;
    Interval valid = FOREVER;
    map.Update(0, valid);
    ASSERT_TRUE(map.IsLoaded());
    std::atomic<int> wrong{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([&] {
            for (int i = 0; i < 500; ++i) {
                const int x = i % 4;
                if (std::abs(At(map, (x + 0.5f) / 4, 0.5f + 0.125f).r - x / 4.0f) > 1e-5f) ++wrong;
            }
        });
    for (auto& t : threads) t.join();
    EXPECT_EQ(wrong, 0);
}
