// CompiledShaderRegistry: compilation, the OSLCache folder, repairs, lookups, include paths.
#include "compile/compiled_shader_registry.h"
#include "scratch_host.h"

#include <trelm/core/notifications.h>
#include <trelm/log/render_message_manager.h>
#include <trelm/log/system_log.h>

#include <gtest/gtest.h>

#include <fstream>
#include <sstream>

namespace fs = std::filesystem;

namespace {

std::string ReadFile(const fs::path& file) {
    std::ifstream in(file, std::ios::binary);
    std::ostringstream s;
    s << in.rdbuf();
    return s.str();
}

void WriteFile(const fs::path& file, const std::string& text) {
    fs::create_directories(file.parent_path());
    std::ofstream out(file, std::ios::binary | std::ios::trunc);
    out << text;
}

// Collects compiler messages.
class CollectingHandler : public OIIO::ErrorHandler {
public:
    void operator()(int code, const std::string& msg) override {
        messages += std::to_string(code) + ":" + msg + "\n";
    }
    std::string messages;
};

// A shader whose text is unique per tag, so every test owns its own key.
std::string SimpleShader(const std::string& tag) {
    return "// " + tag + "\nshader simple_" + tag +
           "(float Kd = 0.25, output color Cout = 0) { Cout = color(Kd); }\n";
}

class RegistryTest : public ::testing::Test {
protected:
    void SetUp() override { ScratchHostRoot(); }
    CompiledShaderRegistry& registry() { return CompiledShaderRegistry::Instance(); }
};

int CountLogEntries(std::uint64_t since, const std::string& text) {
    int n = 0;
    for (const auto& m : TrelmSDK::GetSystemLog().Messages().Since(since)) n += m.text == text;
    return n;
}

} // namespace

TEST_F(RegistryTest, CacheLivesInPluginDataFolder) {
    const fs::path folder = CompiledShaderRegistry::CacheFolder();
    EXPECT_EQ(folder.filename(), "OSLCache");
    EXPECT_EQ(folder.parent_path(),
              IPathConfigMgr::GetPathConfigMgr()->GetDir(TrelmSDK::APP_PLUGIN_DATA_DIR));
    EXPECT_EQ(CompiledShaderRegistry::CacheFile(417419622498ull).filename(),
              "shader417419622498.oso");
    EXPECT_EQ(CompiledShaderRegistry::StdOslPath().filename(), "stdosl.h");
    EXPECT_EQ(CompiledShaderRegistry::StdOslPath().parent_path().filename(), "OSL");
    registry();
    EXPECT_TRUE(fs::exists(CompiledShaderRegistry::StdOslPath()));
}

TEST_F(RegistryTest, TwoCompilationsMakeOneCacheFileAndOneDescription) {
    const std::string src = SimpleShader("twice");
    const SourceKey key = SourceKeyOf(src);
    EXPECT_FALSE(registry().Contains(key));
    // The first compilation of a process also creates the shading system, which compiles the
    // built-in shaders; count from after that so only this shader's runs are seen.
    ASSERT_TRUE(registry().Compile(SimpleShader("twice_warmup")));
    const int runs = registry().CompilerRuns();
    ASSERT_TRUE(registry().Compile(src));
    EXPECT_EQ(registry().CompilerRuns(), runs + 1);
    const fs::path cache = CompiledShaderRegistry::CacheFile(key);
    ASSERT_TRUE(fs::exists(cache));
    const std::string cached = ReadFile(cache);
    EXPECT_EQ(cached, registry().CompiledText(key));
    EXPECT_EQ(cached.rfind("OpenShadingLanguage 1.00", 0), 0u);

    ASSERT_TRUE(registry().Compile(src));
    EXPECT_EQ(registry().CompilerRuns(), runs + 1) << "the second compile reads the cache";
    int files = 0;
    for (const auto& e : fs::directory_iterator(CompiledShaderRegistry::CacheFolder()))
        files += e.path().filename() == cache.filename();
    EXPECT_EQ(files, 1);
    EXPECT_EQ(ReadFile(cache), cached);
    EXPECT_TRUE(registry().Contains(key));
    EXPECT_EQ(registry().RecordedShaderName(key), "simple_twice");
    EXPECT_NE(registry().Find(key), nullptr);
}

TEST_F(RegistryTest, DamagedCacheFileIsCutLoggedOnceAndLoaded) {
    const std::string src = SimpleShader("damaged");
    const SourceKey key = SourceKeyOf(src);
    // Produce good bytecode under another key, then plant it with trailing junk as this key's
    // cache file, as a run of an older build could have left it.
    const std::string other = SimpleShader("damaged_source");
    ASSERT_TRUE(registry().Compile(other));
    const std::string good = registry().CompiledText(SourceKeyOf(other));
    ASSERT_GT(good.size(), 6u);
    ASSERT_EQ(good.substr(good.size() - 6), "\n\tend\n");
    WriteFile(CompiledShaderRegistry::CacheFile(key), good + "\x01junk after the end\n\tend\n");

    const auto since = TrelmSDK::GetSystemLog().Messages().LastSequence();
    const int runs = registry().CompilerRuns();
    ASSERT_TRUE(registry().Compile(src));
    EXPECT_EQ(registry().CompilerRuns(), runs) << "a repaired cache file needs no compiler";
    EXPECT_EQ(registry().CompiledText(key), good);
    EXPECT_EQ(CountLogEntries(since, "OSO corruption mitigation kicked in after cache reload."), 1);
    EXPECT_EQ(CountLogEntries(since, "OSO corruption mitigation kicked in after compiler."), 0);
    bool traced = false;
    for (const auto& m : TrelmSDK::GetSystemLog().Messages().Since(since))
        traced |= m.text.rfind("OSO corruption detected after cache reload:\n", 0) == 0 &&
                  m.text.find("junk after the end") != std::string::npos;
    EXPECT_TRUE(traced);
}

TEST_F(RegistryTest, RepairLeavesSoundTextAlone) {
    std::string sound = "OpenShadingLanguage 1.00\nshader x\n\tend\n";
    EXPECT_FALSE(RepairCompiledText(sound, "compiler"));
    EXPECT_EQ(sound, "OpenShadingLanguage 1.00\nshader x\n\tend\n");
    std::string noEnd = "no end marker";
    EXPECT_FALSE(RepairCompiledText(noEnd, "compiler"));
    std::string cut = "a\n\tend\nb";
    EXPECT_TRUE(RepairCompiledText(cut, "compiler"));
    EXPECT_EQ(cut, "a\n\tend\n");
    std::string first = "\n\tend\n\n\tend\n";
    EXPECT_TRUE(RepairCompiledText(first, "compiler"));
    EXPECT_EQ(first, "\n\tend\n");
}

TEST_F(RegistryTest, BytecodeInputIsLoadedWithoutCompiling) {
    const std::string src = SimpleShader("bytecode_origin");
    ASSERT_TRUE(registry().Compile(src));
    // Make the bytecode text distinct from every other in this process.
    const std::string oso = registry().CompiledText(SourceKeyOf(src));
    const std::string input = oso.substr(0, oso.find('\n') + 1) + "# hand-carried copy\n" +
                              oso.substr(oso.find('\n') + 1);
    const SourceKey key = SourceKeyOf(input);
    const int runs = registry().CompilerRuns();
    ASSERT_TRUE(registry().Compile(input));
    EXPECT_EQ(registry().CompilerRuns(), runs);
    EXPECT_EQ(ReadFile(CompiledShaderRegistry::CacheFile(key)), input);
    EXPECT_EQ(registry().CompiledText(key), input);
    EXPECT_EQ(registry().RecordedShaderName(key), "simple_bytecode_origin");
}

TEST_F(RegistryTest, UnloadableBytecodeIsTriedThreeTimesThenReported) {
    const std::string input = "OpenShadingLanguage 1.00\nthis is not bytecode\n";
    const SourceKey key = SourceKeyOf(input);
    auto& render = TrelmSDK::GetRenderMessageManager().Messages();
    const auto before = render.LastSequence();
    EXPECT_FALSE(registry().Compile(input));
    EXPECT_FALSE(registry().Contains(key));
    int reported = 0;
    for (const auto& m : render.Since(before))
        reported += m.text == "Could not load compiled buffer from \"\"" && m.type == 2;
    EXPECT_EQ(reported, 1);
}

TEST_F(RegistryTest, CompilerErrorsGoToTheGivenHandlerAndRecordNothing) {
    const std::string src = "shader broken_one(float x = 1, output float y = 0) { y = x +; }\n";
    const SourceKey key = SourceKeyOf(src);
    CollectingHandler handler;
    EXPECT_FALSE(registry().Compile(src, &handler, L"broken.osl"));
    EXPECT_FALSE(registry().Contains(key));
    EXPECT_FALSE(fs::exists(CompiledShaderRegistry::CacheFile(key)));
    EXPECT_NE(handler.messages.find("broken.osl:1: error"), std::string::npos) << handler.messages;
}

TEST_F(RegistryTest, ExceptionMessagesQuoteAtMost1000Bytes) {
    const std::string longSource(2500, 'x');
    const std::string msg = CompileExceptionMessage("bad_alloc", longSource);
    EXPECT_EQ(msg, "Exception bad_alloc occurred attempting to compile this code:\n" +
                       std::string(1000, 'x') + "...\n");
    EXPECT_EQ(CompileExceptionMessage("oops", "short"),
              "Exception oops occurred attempting to compile this code:\nshort...\n");
    EXPECT_EQ(CompileExceptionMessage(nullptr, longSource),
              "Unknown Exception occurred attempting to compile this code:\n" +
                  std::string(1000, 'x') + "...\n");
}

TEST_F(RegistryTest, LookupsOfUnknownKeysAnswerEmpty) {
    const SourceKey unknown = 12345;
    EXPECT_FALSE(registry().Contains(unknown));
    EXPECT_EQ(registry().Find(unknown), nullptr);
    EXPECT_EQ(registry().CompiledText(unknown), "");
    EXPECT_EQ(registry().RecordedShaderName(unknown), "");
    EXPECT_TRUE(registry().Names(unknown).empty());
    EXPECT_TRUE(registry().Labels(unknown).empty());
    EXPECT_TRUE(registry().OutputNames(unknown).empty());
    EXPECT_EQ(registry().MapLabels(unknown), std::vector<MSTR>{L"NO VALID OUTPUT"});
    EXPECT_EQ(registry().OutputIndex(unknown, 0), -1);
    EXPECT_EQ(registry().MetadataValue(unknown, "", "help"), "");
}

TEST_F(RegistryTest, ClearCompiledCacheBySourceFileAndWhole) {
    const std::string a = SimpleShader("clear_a"), b = SimpleShader("clear_b");
    ASSERT_TRUE(registry().Compile(a));
    ASSERT_TRUE(registry().Compile(b));
    const fs::path sourceFile = ScratchHostRoot() / "clear_a.osl";
    WriteFile(sourceFile, a);
    registry().ClearCompiledCache(sourceFile);
    EXPECT_FALSE(fs::exists(CompiledShaderRegistry::CacheFile(SourceKeyOf(a))));
    EXPECT_TRUE(fs::exists(CompiledShaderRegistry::CacheFile(SourceKeyOf(b))));
    registry().ClearCompiledCache(ScratchHostRoot() / "missing.osl"); // nothing happens

    const fs::path keepDir = CompiledShaderRegistry::CacheFolder() / "folder.oso";
    const fs::path keepTxt = CompiledShaderRegistry::CacheFolder() / "notes.txt";
    fs::create_directories(keepDir);
    WriteFile(keepTxt, "kept");
    registry().ClearCompiledCache();
    EXPECT_FALSE(fs::exists(CompiledShaderRegistry::CacheFile(SourceKeyOf(b))));
    EXPECT_TRUE(fs::is_directory(keepDir));
    EXPECT_TRUE(fs::exists(keepTxt));
    // Descriptions stay; a later compile rebuilds the cache file.
    EXPECT_TRUE(registry().Contains(SourceKeyOf(b)));
    ASSERT_TRUE(registry().Compile(b));
    EXPECT_TRUE(fs::exists(CompiledShaderRegistry::CacheFile(SourceKeyOf(b))));
}

TEST_F(RegistryTest, IncludePathsReachTheCompilerInOrder) {
    const fs::path first = ScratchHostRoot() / "inc1", second = ScratchHostRoot() / "inc2";
    WriteFile(first / "only_first.h", "#define FIRST_VALUE 0.5\n");
    WriteFile(second / "only_second.h", "#define SECOND_VALUE 0.25\n");
    registry().AddIncludePath(first.string());
    registry().AddIncludePath(second.string());
    const auto paths = registry().IncludePaths();
    ASSERT_GE(paths.size(), 2u);
    EXPECT_EQ(paths[paths.size() - 2], first.string());
    EXPECT_EQ(paths.back(), second.string());
    const std::string src = "#include \"only_first.h\"\n#include \"only_second.h\"\n"
                            "shader inc(float a = FIRST_VALUE, float b = SECOND_VALUE,"
                            " output float o = 0) { o = a + b; }\n";
    CollectingHandler handler;
    ASSERT_TRUE(registry().Compile(src, &handler)) << handler.messages;
    auto desc = registry().Find(SourceKeyOf(src));
    ASSERT_NE(desc, nullptr);
    ASSERT_NE(desc->GetParamDef(0), nullptr);
    ASSERT_NE(desc->GetParamDef(1), nullptr);
    EXPECT_FLOAT_EQ(desc->GetParamDef(0)->def.Get<float>(), 0.5f);
    EXPECT_FLOAT_EQ(desc->GetParamDef(1)->def.Get<float>(), 0.25f);
}

TEST_F(RegistryTest, WatcherFlagFollowsNotifications21And94) {
    EXPECT_TRUE(registry().WatcherFlag());
    BroadcastNotification(94);
    EXPECT_FALSE(registry().WatcherFlag());
    BroadcastNotification(94);
    EXPECT_FALSE(registry().WatcherFlag());
    BroadcastNotification(21);
    EXPECT_TRUE(registry().WatcherFlag());
}

TEST_F(RegistryTest, DescriptorForVersionIsBuiltOnceUnderTheDerivedKey) {
    const std::string src = "shader versions(int i = 1 [[ int connectable = 0 ]], float fa[2] = "
                            "{1, 2}, output float o = 0) { o = i + fa[0]; }\n";
    ASSERT_TRUE(registry().Compile(src));
    const SourceKey key = SourceKeyOf(src);
    auto current = registry().Find(key);
    auto old = registry().DescriptorForVersion(key, 20190);
    ASSERT_NE(old, nullptr);
    EXPECT_NE(old, current);
    EXPECT_EQ(registry().DescriptorForVersion(key, 20190), old);
    EXPECT_TRUE(registry().Contains(CompiledShaderRegistry::DerivedKey(key, 20190)));
    // 20190: no array entry, and the int gets a companion despite connectable 0.
    EXPECT_EQ(old->GetParamDef(1), nullptr);
    EXPECT_NE(old->GetParamDef(3), nullptr); // N = 3: companion of parameter 0
    EXPECT_EQ(current->GetParamDef(3), nullptr);
    auto same = registry().DescriptorForVersion(key, 20191);
    ASSERT_NE(same, nullptr);
    EXPECT_EQ(same->Count(), current->Count());
}
