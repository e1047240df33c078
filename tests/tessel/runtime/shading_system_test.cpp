// GetShadingSystem: creation, attributes, closures, texture configuration, built-in shaders and
// the runtime's notification work.
#include "../compile/scratch_host.h"
#include "compile/compiled_shader_registry.h"
#include "runtime/builtin_shaders.h"
#include "runtime/shading_system.h"
#include "runtime/trelm_render_services.h"

#include <OSL/oslquery.h>
#include <OSL/shaderglobals.h>
#include <trelm/core/notifications.h>

#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>

namespace fs = std::filesystem;

namespace {

class ShadingSystemTest : public ::testing::Test {
protected:
    void SetUp() override { ScratchHostRoot(); }
    CompiledShaderRegistry& registry() { return CompiledShaderRegistry::Instance(); }
};

// Sets or clears TRELM_OSL_OPT for one scope.
class ScopedOptEnv {
public:
    explicit ScopedOptEnv(const char* value) {
        if (value)
            setenv("TRELM_OSL_OPT", value, 1);
        else
            unsetenv("TRELM_OSL_OPT");
    }
    ~ScopedOptEnv() { unsetenv("TRELM_OSL_OPT"); }
};

fs::path FreshConfigFile(const std::string& name) {
    const fs::path file = ScratchHostRoot() / name;
    fs::remove(file);
    return file;
}

} // namespace

TEST_F(ShadingSystemTest, OptimizeLevelFromTheEnvironment) {
    {
        ScopedOptEnv env(nullptr);
        EXPECT_EQ(OptimizeLevelFromEnvironment(), 2);
    }
    {
        ScopedOptEnv env("0");
        EXPECT_EQ(OptimizeLevelFromEnvironment(), 0);
    }
    {
        ScopedOptEnv env("abc");
        EXPECT_EQ(OptimizeLevelFromEnvironment(), 0);
    }
    {
        ScopedOptEnv env("1");
        EXPECT_EQ(OptimizeLevelFromEnvironment(), 1);
    }
}

TEST_F(ShadingSystemTest, CreatedOnceWithItsAttributes) {
    OSL::ShadingSystem* ss = GetShadingSystem(registry());
    ASSERT_NE(ss, nullptr);
    EXPECT_EQ(registry().shadingSystem, ss);
    EXPECT_EQ(registry().shadingSystemOwner.get(), ss);
    EXPECT_EQ(ss->renderer(), &TrelmRenderServices::Instance());
    int value = -1;
    ASSERT_TRUE(ss->getattribute("optimize", value));
    EXPECT_EQ(value, 2) << "TRELM_OSL_OPT is unset in this process";
    ASSERT_TRUE(ss->getattribute("lockgeom", value));
    EXPECT_EQ(value, 1);
    ASSERT_TRUE(ss->getattribute("compile_report", value));
    EXPECT_EQ(value, 1);
    ASSERT_TRUE(ss->getattribute("debug", value));
    EXPECT_EQ(value, 0);
    ASSERT_NE(ss->texturesys(), nullptr);
    int gray = 0;
    ASSERT_TRUE(ss->texturesys()->getattribute("gray_to_rgb", gray));
    EXPECT_EQ(gray, 1);
    EXPECT_EQ(RegisteredClosureCount(), 14);
}

TEST_F(ShadingSystemTest, SecondCallDoesNothingNew) {
    OSL::ShadingSystem* first = GetShadingSystem(registry());
    const int closures = RegisteredClosureCount();
    const int runs = registry().CompilerRuns();
    // A changed environment has no effect once the system exists.
    ScopedOptEnv env("0");
    OSL::ShadingSystem* second = GetShadingSystem(registry());
    EXPECT_EQ(first, second);
    EXPECT_EQ(RegisteredClosureCount(), closures);
    EXPECT_EQ(registry().CompilerRuns(), runs);
    int value = -1;
    ASSERT_TRUE(second->getattribute("optimize", value));
    EXPECT_EQ(value, 2);
}

TEST_F(ShadingSystemTest, ClosureTableInRegistrationOrder) {
    OSL::ShadingSystem& ss = *GetShadingSystem(registry());
    // Parameter lists are read without their terminating entry: the shading system keeps the
    // record size apart from the list.
    auto query = [&](int id) {
        const char* name = nullptr;
        const OSL::ClosureParam* params = nullptr;
        EXPECT_TRUE(ss.query_closure(&name, &id, &params));
        return std::make_pair(std::string(name ? name : ""), params);
    };
    const char* names[] = {"emission",   "background",  "diffuse",    "oren_nayar", "translucent",
                           "phong",      "ward",        "microfacet", "reflection", "reflection",
                           "refraction", "transparent", "debug",      "holdout"};
    for (int id = 1; id <= 14; ++id) EXPECT_EQ(query(id).first, names[id - 1]) << id;

    const auto diffuse = query(3).second;
    EXPECT_EQ(diffuse[0].type, OSL::TypeVector);
    EXPECT_EQ(diffuse[0].offset, 0);
    EXPECT_EQ(diffuse[0].field_size, 12);
    EXPECT_EQ(diffuse[1].type, OSL::TypeString);
    EXPECT_EQ(diffuse[1].offset, 16);
    EXPECT_STREQ(diffuse[1].key, "label");

    const auto microfacet = query(8).second;
    const int offsets[] = {0, 8, 20, 32, 36, 40, 44};
    for (int k = 0; k < 7; ++k) EXPECT_EQ(microfacet[k].offset, offsets[k]) << k;
    EXPECT_EQ(microfacet[0].type, OSL::TypeString);
    EXPECT_EQ(microfacet[6].type, OSL::TypeInt);

    const auto reflection2 = query(10).second;
    EXPECT_EQ(reflection2[1].type, OSL::TypeFloat);
    EXPECT_EQ(reflection2[1].offset, 12);
    const auto ward = query(7).second;
    EXPECT_EQ(ward[1].offset, 12);
    EXPECT_EQ(ward[3].offset, 28);
    // Looking a closure up by name finds the first registration.
    const char* byName = "reflection";
    int id = 0;
    ASSERT_TRUE(ss.query_closure(&byName, &id, nullptr));
    EXPECT_EQ(id, 9);
}

TEST_F(ShadingSystemTest, TextureConfigurationWrittenOnFirstRun) {
    ConfigManager config(FreshConfigFile("first-run.ini"));
    OIIO::TextureSystem* ts = OIIO::TextureSystem::create(false);
    EXPECT_TRUE(ApplyTextureConfiguration(config, ts));
    EXPECT_EQ(config.GetInt("OpenImageIO", "max_open_files"), 100);
    EXPECT_EQ(config.GetFloat("OpenImageIO", "max_memory_MB"), 16384.0f);
    EXPECT_EQ(config.GetInt("OpenImageIO", "autotile"), 0);
    EXPECT_EQ(config.GetInt("OpenImageIO", "automip"), 1);
    EXPECT_EQ(config.GetInt("OpenImageIO", "autoscanline"), 0);
    EXPECT_EQ(config.GetInt("OpenImageIO", "autoFileUpdate"), 1);
    EXPECT_EQ(config.Keys("OpenImageIO").size(), 6u);
    // The file on disk holds them, for the user to edit.
    ConfigManager reread(config.FilePath());
    EXPECT_EQ(reread.GetInt("OpenImageIO", "max_open_files"), 100);
    int openFiles = 0;
    ASSERT_TRUE(ts->getattribute("max_open_files", openFiles));
    EXPECT_EQ(openFiles, 100);
    OIIO::TextureSystem::destroy(ts);
}

TEST_F(ShadingSystemTest, UserValuesAreAppliedAndKept) {
    const fs::path file = FreshConfigFile("user.ini");
    {
        std::ofstream out(file);
        out << "[OpenImageIO]\nmax_memory_MB=4096\nautomip=0\nautoFileUpdate=0\n";
    }
    ConfigManager config(file);
    OIIO::TextureSystem* ts = OIIO::TextureSystem::create(false);
    EXPECT_FALSE(ApplyTextureConfiguration(config, ts));
    EXPECT_EQ(config.GetFloat("OpenImageIO", "max_memory_MB"), 4096.0f);
    EXPECT_EQ(config.GetInt("OpenImageIO", "automip"), 0);
    EXPECT_EQ(config.GetInt("OpenImageIO", "max_open_files"), 100) << "missing keys are added";
    float memory = 0;
    ASSERT_TRUE(ts->getattribute("max_memory_MB", memory));
    EXPECT_EQ(memory, 4096.0f);
    int automip = -1;
    ASSERT_TRUE(ts->getattribute("automip", automip));
    EXPECT_EQ(automip, 0);
    OIIO::TextureSystem::destroy(ts);
}

TEST_F(ShadingSystemTest, ProcessConfigurationGotItsSection) {
    GetShadingSystem(registry());
    EXPECT_TRUE(TrelmSDK::GetConfigManager().HasKey("OpenImageIO", "autoFileUpdate"));
    EXPECT_TRUE(AutoFileUpdate());
}

TEST_F(ShadingSystemTest, BuiltinShadersAreLoadedUnderTheirNames) {
    GetShadingSystem(registry());
    for (const char* source : {kTrelmTexmapSource, kTrelmRootSource}) {
        const SourceKey key = SourceKeyOf(source);
        EXPECT_TRUE(registry().Contains(key));
    }
    auto texmap = registry().Description(SourceKeyOf(kTrelmTexmapSource));
    ASSERT_NE(texmap, nullptr);
    EXPECT_EQ(texmap->shaderName, "trelm_Texmap");
    EXPECT_EQ(texmap->outputNames, (std::vector<MSTR>{L"Col", L"Flt", L"Int"}));
    auto root = registry().Description(SourceKeyOf(kTrelmRootSource));
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(root->outputNames, (std::vector<MSTR>{L"NormalPerturb", L"EvalColor"}));
    const ParamDef* bump = root->blockDesc->GetParamDef(1);
    ASSERT_NE(bump, nullptr);
    EXPECT_FLOAT_EQ(bump->def.Get<float>(), 0.5f);

    // Both names instantiate as layers of a group.
    OSL::ShadingSystem& ss = *registry().shadingSystem;
    auto group = ss.ShaderGroupBegin("builtins");
    EXPECT_TRUE(ss.Shader(*group, "surface", kTrelmTexmapName, "attr"));
    EXPECT_TRUE(ss.Shader(*group, "surface", kTrelmRootName, "root"));
    EXPECT_TRUE(ss.ConnectShaders(*group, "attr", "Col", "root", "Input"));
    EXPECT_TRUE(ss.ShaderGroupEnd(*group));
}

TEST_F(ShadingSystemTest, BothReflectionClosuresInstantiate) {
    OSL::ShadingSystem& ss = *GetShadingSystem(registry());
    const std::string one = "shader refl_one(output closure color c = 0) { c = reflection(N); "
                            "Ci = c; }\n";
    const std::string two = "shader refl_two(float eta = 1.5, output closure color c = 0) "
                            "{ c = reflection(N, eta); Ci = c; }\n";
    int layer = 0;
    for (const std::string& src : {one, two}) {
        SCOPED_TRACE(src);
        ASSERT_TRUE(registry().Compile(src));
        auto group = ss.ShaderGroupBegin("refl" + std::to_string(layer++));
        ASSERT_TRUE(ss.Shader(*group, "surface", ShaderNameOf(SourceKeyOf(src)), "l"));
        ASSERT_TRUE(ss.ShaderGroupEnd(*group));
        OSL::PerThreadInfo* thread = ss.create_thread_info();
        OSL::ShadingContext* ctx = ss.get_context(thread);
        OSL::ShaderGlobals sg{};
        sg.N = sg.Ng = OSL::Vec3(0, 0, 1);
        sg.I = OSL::Vec3(0, 0, -1);
        EXPECT_TRUE(ss.execute(*ctx, *group, sg));
        ASSERT_NE(sg.Ci, nullptr) << "the closure was built";
        ss.release_context(ctx);
        ss.destroy_thread_info(thread);
    }
}

TEST_F(ShadingSystemTest, Notification57RefreshesRenderServices) {
    GetShadingSystem(registry());
    const int before = TrelmRenderServices::Instance().SceneRefreshes();
    BroadcastNotification(57);
    EXPECT_EQ(TrelmRenderServices::Instance().SceneRefreshes(), before + 1);
    BroadcastNotification(132); // nodes: no node property manager yet, nothing breaks
    BroadcastNotification(238); // texture files closed; the system stays usable
    EXPECT_NE(registry().shadingSystem->texturesys(), nullptr);
}
