#include "temp_folder.h"

#include <trelm/config/config_manager.h>
#include <trelm/log/system_log.h>

#include <gtest/gtest.h>

#include <cstdlib>
#include <sys/stat.h>
#include <thread>

using namespace TrelmSDK;
using trelm_test::readFile;
using trelm_test::TempFolder;
using trelm_test::writeFile;

namespace {

std::size_t countFiles(const std::filesystem::path& folder) {
    std::size_t n = 0;
    for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator(folder)) ++n;
    return n;
}

// Numbered names; built by appending, which GCC 12's -Wrestrict does not misread.
std::string numbered(std::string prefix, int n) {
    prefix += std::to_string(n);
    return prefix;
}

bool systemLogHas(std::uint64_t after, std::string_view needle) {
    for (const LogMessage& m : GetSystemLog().Messages().Since(after))
        if (m.text.find(needle) != std::string::npos) return true;
    return false;
}

} // namespace

TEST(ConfigManager, FirstReadCreatesTheFileWithDefaults) {
    TempFolder tmp;
    const auto file = tmp.path() / "nested" / "trelm" / "trelm.ini";
    ConfigManager config(file);
    EXPECT_FALSE(std::filesystem::exists(file));

    ConfigSection oiio = config.Section("OpenImageIO");
    EXPECT_EQ(oiio.ReadInt("max_open_files", 100), 100);
    EXPECT_FLOAT_EQ(oiio.ReadFloat("max_memory_MB", 16384.0f), 16384.0f);
    EXPECT_EQ(config.ReadString("OSL", "OSLEditorFont", "Consolas"), "Consolas");

    ASSERT_TRUE(std::filesystem::exists(file));
    EXPECT_EQ(readFile(file), "[OpenImageIO]\nmax_open_files=100\nmax_memory_MB=16384.0\n\n"
                              "[OSL]\nOSLEditorFont=Consolas\n");
    // A second manager (the next run) reads them back without writing.
    ConfigManager nextRun(file);
    EXPECT_EQ(nextRun.GetInt("OpenImageIO", "max_open_files"), 100);
    EXPECT_EQ(nextRun.GetFloat("OpenImageIO", "max_memory_MB"), 16384.0f);
}

TEST(ConfigManager, UserChangedValueIsKeptAndUsed) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    ConfigManager config(file);
    EXPECT_FLOAT_EQ(config.ReadFloat("OpenImageIO", "max_memory_MB", 16384.0f), 16384.0f);

    // The user edits the file while the host runs.
    writeFile(file, "; my settings\n[OpenImageIO]\nmax_memory_MB = 4096\n");
    EXPECT_FLOAT_EQ(config.ReadFloat("OpenImageIO", "max_memory_MB", 16384.0f), 4096.0f);
    EXPECT_EQ(config.ReadInt("OpenImageIO", "autotile", 0), 0);
    EXPECT_EQ(readFile(file), "; my settings\n[OpenImageIO]\nmax_memory_MB = 4096\nautotile=0\n");

    ConfigManager nextRun(file);
    EXPECT_FLOAT_EQ(nextRun.ReadFloat("OpenImageIO", "max_memory_MB", 16384.0f), 4096.0f);
}

TEST(ConfigManager, GetDoesNotWriteAndMissingKeysReadAsNothing) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    ConfigManager config(file);
    EXPECT_FALSE(config.GetInt("OSL", "OptimizationCache"));
    EXPECT_FALSE(config.HasKey("OSL", "OptimizationCache"));
    EXPECT_FALSE(std::filesystem::exists(file));
    EXPECT_EQ(config.ReadInt("OSL", "OptimizationCache", 1), 1);
    EXPECT_TRUE(config.HasKey("OSL", "OptimizationCache"));
    EXPECT_TRUE(config.HasSection("osl"));
}

TEST(ConfigManager, MalformedValueKeepsUserTextWarnsAndUsesDefault) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    const std::string text = "[OSL]\nViewportUDIMMaxCount=lots\nuse_property_cache=1.5\n";
    writeFile(file, text);
    ConfigManager config(file);
    const auto before = GetSystemLog().Messages().LastSequence();
    EXPECT_EQ(config.ReadInt("OSL", "ViewportUDIMMaxCount", 64), 64);
    EXPECT_EQ(config.ReadInt("OSL", "use_property_cache", 1), 1);
    EXPECT_FALSE(config.GetInt("OSL", "ViewportUDIMMaxCount"));
    EXPECT_EQ(config.GetFloat("OSL", "use_property_cache"), 1.5f);
    EXPECT_EQ(readFile(file), text);
    EXPECT_TRUE(systemLogHas(before, "ViewportUDIMMaxCount = \"lots\" is not an integer"));
}

TEST(ConfigManager, MalformedLinesAreToleratedAndKept) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    writeFile(file, "garbage without equals\n[OSL\n[OSL]\nOptimizationCache=0\n");
    const auto before = GetSystemLog().Messages().LastSequence();
    ConfigManager config(file);
    EXPECT_EQ(config.ReadInt("OSL", "OptimizationCache", 1), 0);
    EXPECT_EQ(config.Issues().size(), 2u);
    EXPECT_TRUE(systemLogHas(before, "line 1"));
    EXPECT_TRUE(systemLogHas(before, "line 2"));
    ASSERT_TRUE(config.SetInt("OSL", "use_property_cache", 1));
    EXPECT_EQ(readFile(file), "garbage without equals\n[OSL\n[OSL]\nOptimizationCache=0\n"
                              "use_property_cache=1\n");
}

TEST(ConfigManager, SaveIsAtomicAndLeavesNoTemporaryFiles) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    ConfigManager config(file);
    for (int i = 0; i < 20; ++i) ASSERT_TRUE(config.SetInt("OSL", numbered("k", i), i));
    EXPECT_EQ(countFiles(tmp.path()), 1u);
    ConfigManager reread(file);
    for (int i = 0; i < 20; ++i) EXPECT_EQ(reread.GetInt("OSL", numbered("k", i)), i);
}

TEST(ConfigManager, SaveKeepsTheFilesPermissions) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    writeFile(file, "[OSL]\n");
    ASSERT_EQ(::chmod(file.c_str(), 0600), 0);
    ConfigManager config(file);
    ASSERT_TRUE(config.SetInt("OSL", "a", 1));
    struct stat info {};
    ASSERT_EQ(::stat(file.c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0600u);
}

TEST(ConfigManager, UnwritableLocationReportsAndKeepsValueInMemory) {
    TempFolder tmp;
    writeFile(tmp.path() / "not-a-folder", "x");
    ConfigManager config(tmp.path() / "not-a-folder" / "trelm.ini");
    EXPECT_FALSE(config.SetInt("OSL", "a", 3));
    EXPECT_NE(config.LastError().find("cannot"), std::string::npos);
    EXPECT_EQ(config.GetInt("OSL", "a"), 3);
    // A read with a default still answers.
    EXPECT_EQ(config.ReadInt("OSL", "b", 7), 7);
    EXPECT_EQ(readFile(tmp.path() / "not-a-folder"), "x");
}

TEST(ConfigManager, SavingThroughASymlinkReplacesItsTarget) {
    TempFolder tmp;
    const auto real = tmp.path() / "real.ini";
    const auto link = tmp.path() / "trelm.ini";
    writeFile(real, "[OSL]\n");
    std::filesystem::create_symlink(real, link);
    ConfigManager config(link);
    ASSERT_TRUE(config.SetInt("OSL", "a", 1));
    EXPECT_TRUE(std::filesystem::is_symlink(link));
    EXPECT_EQ(readFile(real), "[OSL]\na=1\n");
}

TEST(ConfigManager, WithoutAutoSaveChangesWaitForSave) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    ConfigManager config(file);
    config.SetAutoSave(false);
    ASSERT_TRUE(config.SetInt("OpenImageIO", "autotile", 0));
    ASSERT_TRUE(config.SetInt("OpenImageIO", "automip", 1));
    EXPECT_FALSE(std::filesystem::exists(file));
    ASSERT_TRUE(config.Save());
    EXPECT_EQ(readFile(file), "[OpenImageIO]\nautotile=0\nautomip=1\n");
}

TEST(ConfigManager, StringsWithBlanksRoundTripAndLineBreaksAreRefused) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    ConfigManager config(file);
    ASSERT_TRUE(config.SetString("OSL", "OSLEditorFont", " DejaVu Sans Mono "));
    EXPECT_FALSE(config.SetString("OSL", "bad", "a\nb"));
    EXPECT_FALSE(config.SetInt("OSL", "bad=key", 1));
    ConfigManager reread(file);
    EXPECT_EQ(reread.GetString("OSL", "OSLEditorFont"), " DejaVu Sans Mono ");
    EXPECT_FALSE(reread.HasKey("OSL", "bad"));
}

TEST(ConfigManager, RemoveKeyAndSwitchFiles) {
    TempFolder tmp;
    ConfigManager config(tmp.path() / "a.ini");
    ASSERT_TRUE(config.SetInt("OSL", "a", 1));
    EXPECT_TRUE(config.RemoveKey("OSL", "a"));
    EXPECT_FALSE(config.RemoveKey("OSL", "a"));
    EXPECT_EQ(readFile(tmp.path() / "a.ini"), "[OSL]\n");
    writeFile(tmp.path() / "b.ini", "[OSL]\na=2\n");
    config.SetFilePath(tmp.path() / "b.ini");
    EXPECT_EQ(config.GetInt("OSL", "a"), 2);
}

TEST(ConfigManager, NumbersParseStrictlyAndFloatsStayFloats) {
    EXPECT_EQ(ConfigManager::ParseInt(" +12 "), 12);
    EXPECT_EQ(ConfigManager::ParseInt("-7"), -7);
    EXPECT_FALSE(ConfigManager::ParseInt("12abc"));
    EXPECT_FALSE(ConfigManager::ParseInt("1.0"));
    EXPECT_FALSE(ConfigManager::ParseInt("99999999999"));
    EXPECT_FALSE(ConfigManager::ParseInt(""));
    EXPECT_EQ(ConfigManager::ParseFloat("1e3"), 1000.0f);
    EXPECT_EQ(ConfigManager::ParseFloat("0.25"), 0.25f);
    EXPECT_FALSE(ConfigManager::ParseFloat("0,25"));
    EXPECT_EQ(ConfigManager::FormatFloat(16384.0f), "16384.0");
    EXPECT_EQ(ConfigManager::FormatFloat(-2.0f), "-2.0");
    EXPECT_EQ(ConfigManager::FormatFloat(0.1f), "0.1");
    EXPECT_EQ(ConfigManager::ParseFloat(ConfigManager::FormatFloat(1e-20f)), 1e-20f);
}

TEST(ConfigManager, ConcurrentReadsWithDefaultsAllLand) {
    TempFolder tmp;
    const auto file = tmp.path() / "trelm.ini";
    ConfigManager config(file);
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([&config, t] {
            for (int i = 0; i < 25; ++i) {
                const std::string key = numbered(numbered("t", t) + "_", i);
                EXPECT_EQ(config.ReadInt("Threads", key, t * 100 + i), t * 100 + i);
            }
        });
    for (auto& thread : threads) thread.join();
    ConfigManager reread(file);
    EXPECT_EQ(reread.Keys("Threads").size(), 100u);
    EXPECT_EQ(reread.GetInt("Threads", "t3_24"), 324);
}

TEST(ConfigManager, DefaultFileFollowsTheEnvironment) {
    const char* oldConfig = std::getenv("TRELM_CONFIG");
    const char* oldXdg = std::getenv("XDG_CONFIG_HOME");
    const std::string savedConfig = oldConfig ? oldConfig : "";
    const std::string savedXdg = oldXdg ? oldXdg : "";

    ::unsetenv("TRELM_CONFIG");
    ::setenv("XDG_CONFIG_HOME", "/somewhere/config", 1);
    EXPECT_EQ(DefaultConfigFilePath(), std::filesystem::path("/somewhere/config/trelm/trelm.ini"));
    ::setenv("XDG_CONFIG_HOME", "relative/is/ignored", 1);
    EXPECT_EQ(DefaultConfigFilePath().filename(), "trelm.ini");
    EXPECT_NE(DefaultConfigFilePath().string().find(".config/trelm"), std::string::npos);
    ::setenv("TRELM_CONFIG", "/explicit/my.ini", 1);
    EXPECT_EQ(DefaultConfigFilePath(), std::filesystem::path("/explicit/my.ini"));

    if (oldConfig)
        ::setenv("TRELM_CONFIG", savedConfig.c_str(), 1);
    else
        ::unsetenv("TRELM_CONFIG");
    if (oldXdg)
        ::setenv("XDG_CONFIG_HOME", savedXdg.c_str(), 1);
    else
        ::unsetenv("XDG_CONFIG_HOME");
}
