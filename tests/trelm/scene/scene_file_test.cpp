#include <trelm/scene/bitmap_tex.h>
#include <trelm/scene/color_pipeline.h>
#include <trelm/scene/object.h>
#include <trelm/scene/particle_system.h>
#include <trelm/scene/scene_file.h>
#include <trelm/scene/texmap_registry.h>

#include <nlohmann/json.hpp>

#include <gtest/gtest.h>

#include <filesystem>

using namespace TrelmSDK;

namespace {

const std::filesystem::path kScenes = std::filesystem::path(TESSEL_SOURCE_DIR) / "examples/scenes";

// A minimal valid scene with one extra top-level JSON fragment spliced in.
std::string SceneWith(const std::string& extra) {
    return R"({"format": "trelm-scene", "version": 1)" + (extra.empty() ? "" : ", " + extra) + "}";
}

// Loads text and returns the error (empty when it loaded).
std::string ErrorOf(const std::string& text) {
    std::string error;
    auto scene = LoadSceneText(text, kScenes, error);
    EXPECT_EQ(scene == nullptr, !error.empty()) << error;
    return error;
}

} // namespace

TEST(SceneFile, ShowcaseLoadsEveryKindOfEntry) {
    std::string error;
    auto scene = LoadSceneFile(kScenes / "showcase.json", error);
    ASSERT_TRUE(scene) << error;
    EXPECT_EQ(scene->settings.width, 640);
    EXPECT_EQ(scene->settings.samplesPerAxis, 2);
    EXPECT_EQ(scene->settings.time, 36 * GetTicksPerFrame());
    EXPECT_EQ(scene->Nodes().size(), 5u);
    EXPECT_EQ(scene->lights.size(), 2u);
    INode* ball = scene->FindNode(L"Ball");
    ASSERT_TRUE(ball);
    EXPECT_EQ(ball->GetGBufID(), 3);
    EXPECT_EQ(ball->GetWireColor(), 0x000000FFu); // "#FF0000": red in the low byte
    MSTR tint;
    EXPECT_TRUE(ball->GetUserPropString(L"tint", tint));
    EXPECT_EQ(tint, L"[1, 0.5, 0]");
    EXPECT_EQ(ball->GetObjectTM().GetTrans(), Point3(0, 0, 1));
    ASSERT_TRUE(ball->GetMtl());
    auto* tiles = dynamic_cast<BitmapTex*>(ball->GetMtl()->GetSubTexmap(Material::DIFFUSE_SLOT));
    ASSERT_TRUE(tiles);
    EXPECT_TRUE(std::filesystem::exists(tiles->GetFileName()));
    EXPECT_EQ(tiles->uvGen.uTiling, 2);
    Texmap* boxes = scene->FindMap("Boxes");
    ASSERT_TRUE(boxes);
    EXPECT_EQ(boxes->GetSubTexmap(0), scene->FindMap("Warm"));
    INode* fountain = scene->FindNode(L"Fountain");
    ASSERT_TRUE(fountain && fountain->GetObjectRef()->GetParticleInterface());
    const Interval valid = scene->Update(scene->settings.time);
    EXPECT_TRUE(valid.InInterval(scene->settings.time));
    EXPECT_TRUE(tiles->IsLoaded()) << tiles->LastError();
}

TEST(SceneFile, MappingChannelsAreReadPerNode) {
    std::string error;
    auto scene = LoadSceneText(SceneWith(R"("nodes": [{"name": "P", "geometry": {"type": "plane"},
        "channels": {"2": {"scale": [2, 3, 1], "offset": [0.5, 0, 0]}}}])"),
                               kScenes, error);
    ASSERT_TRUE(scene) << error;
    const Object* obj = scene->FindNode(L"P")->GetObjectRef();
    ASSERT_TRUE(obj->HasChannel(2));
    EXPECT_EQ(obj->Channel(2)->scale, Point3(2, 3, 1));
    EXPECT_TRUE(obj->HasChannel(1));
    EXPECT_FALSE(obj->HasChannel(3));
}

TEST(SceneFile, BadInputIsReportedWithWhereAndWhat) {
    EXPECT_NE(ErrorOf("{ not json").find("not valid JSON"), std::string::npos);
    EXPECT_NE(ErrorOf("[1, 2]").find("JSON object"), std::string::npos);
    EXPECT_NE(ErrorOf(R"({"format": "other"})").find("scene.format"), std::string::npos);
    EXPECT_NE(ErrorOf(R"({"format": "trelm-scene", "version": 9})").find("version 9"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("colours": {})")).find("unknown entry 'colours'"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("render": {"width": "wide"})")).find("render.width"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("render": {"width": 0})")).find("render"), std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("render": {"region": [0.5, 0, 0.2, 1]})")).find("render.region"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("camera": {"fov": 200})")).find("camera.fov"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("camera": {"position": [0, 0, 1], "target": [0, 0, 1]})"))
                  .find("must differ"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("colour": {"rendering_space": "P3"})")).find("P3"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("lights": [{"type": "spot"}])")).find("lights[0].type"),
              std::string::npos);
}

TEST(SceneFile, BadMapsMaterialsAndNodes) {
    EXPECT_NE(ErrorOf(SceneWith(R"("maps": [{"name": "m", "class": "Marble"}])"))
                  .find("unknown map class 'Marble'"),
              std::string::npos);
    EXPECT_NE(
        ErrorOf(
            SceneWith(
                R"("maps": [{"name": "m", "class": "Checker", "params": {"colour1": [1, 0, 0]}}])"))
            .find("maps[0].params: unknown parameter 'colour1'"),
        std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("maps": [{"name": "m", "class": "Bitmap", "params": {}}])"))
                  .find("maps[0].params.file"),
              std::string::npos);
    EXPECT_NE(
        ErrorOf(SceneWith(
                    R"("maps": [{"name": "m", "class": "Checker", "params": {"color1": [1, 0]}}])"))
            .find("params.color1"),
        std::string::npos);
    EXPECT_NE(
        ErrorOf(
            SceneWith(
                R"("maps": [{"name": "m", "class": "Checker"}, {"name": "m", "class": "Checker"}])"))
            .find("maps[1].name"),
        std::string::npos);
    EXPECT_NE(
        ErrorOf(SceneWith(R"("maps": [{"name": "a", "class": "Checker", "slots": {"Color 1": "b"}},
                                            {"name": "b", "class": "Checker", "slots": {"0": "a"}}])"))
            .find("would contain itself"),
        std::string::npos);
    EXPECT_NE(
        ErrorOf(
            SceneWith(R"("maps": [{"name": "a", "class": "Checker", "slots": {"Color 9": "a"}}])"))
            .find("no such slot"),
        std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("materials": [{"name": "m", "diffuse_map": "nothing"}])"))
                  .find("materials[0].diffuse_map: no map named 'nothing'"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("nodes": [{"name": "n"}])")).find("needs a geometry"),
              std::string::npos);
    EXPECT_NE(ErrorOf(SceneWith(R"("nodes": [{"name": "n", "geometry": {"type": "cone"}}])"))
                  .find("nodes[0].geometry.type: unknown geometry 'cone'"),
              std::string::npos);
    EXPECT_NE(
        ErrorOf(
            SceneWith(R"("nodes": [{"name": "n", "geometry": {"type": "sphere", "radius": -1}}])"))
            .find("radius"),
        std::string::npos);
    EXPECT_NE(
        ErrorOf(
            SceneWith(
                R"("nodes": [{"name": "n", "geometry": {"type": "mesh", "file": "missing.obj"}}])"))
            .find("cannot open mesh file"),
        std::string::npos);
    EXPECT_NE(
        ErrorOf(SceneWith(
                    R"("nodes": [{"name": "n", "geometry": {"type": "plane"}, "material": "x"}])"))
            .find("no material named 'x'"),
        std::string::npos);
    EXPECT_NE(
        ErrorOf(
            SceneWith(
                R"("nodes": [{"name": "n", "geometry": {"type": "plane"}, "wire_color": "red"}])"))
            .find("wire_color"),
        std::string::npos);
    EXPECT_NE(
        ErrorOf(
            SceneWith(
                R"("nodes": [{"name": "n", "geometry": {"type": "plane"}, "channels": {"x": {}}}])"))
            .find("channels.x"),
        std::string::npos);
}

TEST(SceneFile, AFailedLoadLeavesTheColourPipelineAlone) {
    ColorPipelineManager& cm = GetColorPipelineMgr();
    cm.SetRenderingSpace("linear");
    EXPECT_FALSE(
        ErrorOf(SceneWith(R"("colour": {"rendering_space": "ACEScg"}, "nodes": [{"name": "n"}])"))
            .empty());
    EXPECT_EQ(cm.RenderingSpace(), "linear");
    EXPECT_TRUE(ErrorOf(SceneWith(R"("colour": {"rendering_space": "ACEScg"})")).empty());
    EXPECT_EQ(cm.RenderingSpace(), "ACEScg");
    cm.SetRenderingSpace("linear");
}

TEST(SceneFile, MissingFileNamesThePath) {
    std::string error;
    EXPECT_FALSE(LoadSceneFile("/nonexistent/scene.json", error));
    EXPECT_NE(error.find("/nonexistent/scene.json: cannot open"), std::string::npos);
}

TEST(TexmapRegistry, PlugInClassesCanBeAddedOnce) {
    auto& reg = TexmapRegistry::Instance();
    EXPECT_TRUE(reg.Find("Bitmap"));
    EXPECT_FALSE(reg.Register("Checker", nullptr));
    const bool added = reg.Register("TestMap",
                                    [](const nlohmann::json&, const MapLoadContext&,
                                       std::string& error) -> std::shared_ptr<Texmap> {
                                        error = "params: test maps cannot be made";
                                        return nullptr;
                                    });
    EXPECT_TRUE(added);
    EXPECT_NE(ErrorOf(SceneWith(R"("maps": [{"name": "m", "class": "TestMap"}])"))
                  .find("maps[0].params: test maps cannot be made"),
              std::string::npos);
}
