#include "temp_folder.h"

#include <trelm/config/config_manager.h>
#include <trelm/config/path_config.h>
#include <trelm/log/system_log.h>

#include <gtest/gtest.h>

#include <cstdlib>

using namespace TrelmSDK;
using trelm_test::TempFolder;

TEST(PathConfig, DirectoriesLiveUnderTheRootAndAreCreatedOnDemand) {
    TempFolder tmp;
    IPathConfigMgr paths;
    paths.SetRoot(tmp.path() / "root");
    const auto plugcfg = paths.GetDir(37);
    EXPECT_EQ(plugcfg, tmp.path() / "root" / "plugcfg");
    EXPECT_TRUE(std::filesystem::is_directory(plugcfg));
    EXPECT_EQ(paths.GetDir(APP_SYSTEM_ROOT_DIR), tmp.path() / "root");
    EXPECT_EQ(paths.GetDir(20), paths.GetRoot());
    EXPECT_EQ(paths.GetDir(APP_LOG_DIR), tmp.path() / "root" / "logs");
    EXPECT_EQ(paths.GetUserDir(USER_DOCUMENTS_DIR), tmp.path() / "root" / "user");
    EXPECT_TRUE(std::filesystem::is_directory(tmp.path() / "root" / "user"));
}

TEST(PathConfig, UnknownIdentifiersGiveAnEmptyPath) {
    IPathConfigMgr paths;
    EXPECT_TRUE(paths.GetDir(9999).empty());
    EXPECT_TRUE(paths.GetDir(-1).empty());
    EXPECT_TRUE(paths.GetUserDir(7).empty());
    EXPECT_FALSE(paths.SetDir(9999, "/tmp"));
    EXPECT_FALSE(IPathConfigMgr::IsKnownDir(9999));
    EXPECT_TRUE(IPathConfigMgr::IsKnownDir(37));
}

TEST(PathConfig, OneDirectoryCanPointElsewhereAndBeReturned) {
    TempFolder tmp;
    IPathConfigMgr paths;
    paths.SetRoot(tmp.path() / "root");
    ASSERT_TRUE(paths.SetDir(20, tmp.path() / "install"));
    EXPECT_EQ(paths.GetDir(20), tmp.path() / "install");
    EXPECT_EQ(paths.GetDir(37), tmp.path() / "root" / "plugcfg");
    paths.SetRoot(tmp.path() / "other");
    EXPECT_EQ(paths.GetDir(20), tmp.path() / "install");
    EXPECT_EQ(paths.GetDir(37), tmp.path() / "other" / "plugcfg");
    ASSERT_TRUE(paths.SetDir(20, {}));
    EXPECT_EQ(paths.GetDir(20), tmp.path() / "other");
}

TEST(PathConfig, UncreatableFolderIsStillReturned) {
    TempFolder tmp;
    std::ofstream(tmp.path() / "file") << "x";
    IPathConfigMgr paths;
    paths.SetRoot(tmp.path() / "file");
    EXPECT_EQ(paths.GetDir(37), tmp.path() / "file" / "plugcfg");
    EXPECT_FALSE(std::filesystem::exists(tmp.path() / "file" / "plugcfg"));
}

TEST(PathConfig, EnvironmentChoosesRootAndAdditionalFolders) {
    const char* oldRoot = std::getenv("TRELM_ROOT");
    const char* oldList = std::getenv("TRELM_ADDITIONAL_FOLDERS");
    const std::string savedRoot = oldRoot ? oldRoot : "", savedList = oldList ? oldList : "";

    ::setenv("TRELM_ROOT", "/opt/trelm-root", 1);
    ::setenv("TRELM_ADDITIONAL_FOLDERS", "/a/osl::/b/osl:", 1);
    IPathConfigMgr paths;
    EXPECT_EQ(paths.GetRoot(), std::filesystem::path("/opt/trelm-root"));
    EXPECT_EQ(paths.GetAdditionalFolders(),
              (std::vector<std::filesystem::path>{"/a/osl", "/b/osl"}));
    paths.AddAdditionalFolder("/c");
    EXPECT_EQ(paths.GetAdditionalFolders().back(), std::filesystem::path("/c"));
    paths.SetAdditionalFolders({});
    EXPECT_TRUE(paths.GetAdditionalFolders().empty());
    paths.SetRoot("/elsewhere");
    paths.SetRoot({});
    EXPECT_EQ(paths.GetRoot(), std::filesystem::path("/opt/trelm-root"));

    if (oldRoot)
        ::setenv("TRELM_ROOT", savedRoot.c_str(), 1);
    else
        ::unsetenv("TRELM_ROOT");
    if (oldList)
        ::setenv("TRELM_ADDITIONAL_FOLDERS", savedList.c_str(), 1);
    else
        ::unsetenv("TRELM_ADDITIONAL_FOLDERS");
}

TEST(PathConfig, ProcessWideManagerIsOne) {
    EXPECT_EQ(IPathConfigMgr::GetPathConfigMgr(), IPathConfigMgr::GetPathConfigMgr());
}

TEST(PathConfig, TheUserCanSetFoldersInTheConfigurationFile) {
    TempFolder tmp;
    const auto ini = tmp.path() / "trelm.ini";
    trelm_test::writeFile(ini, "[Directories]\nRoot = data\nDir20 = /opt/trelm\n"
                               "AdditionalFolders = /a ; shaders\nDir9999 = /x\nColour = red\n");
    ConfigManager config(ini);
    IPathConfigMgr paths;
    const auto before = GetSystemLog().Messages().LastSequence();
    paths.LoadFromConfig(config);
    EXPECT_EQ(paths.GetRoot(), tmp.path() / "data");
    EXPECT_EQ(paths.GetDir(20), std::filesystem::path("/opt/trelm"));
    EXPECT_EQ(paths.GetDir(37), tmp.path() / "data" / "plugcfg");
    EXPECT_EQ(paths.GetAdditionalFolders(),
              (std::vector<std::filesystem::path>{"/a", tmp.path() / "shaders"}));
    EXPECT_EQ(GetSystemLog().Messages().Since(before).size(), 2u);
    // Reading changes nothing in the file.
    EXPECT_EQ(trelm_test::readFile(ini).find("Dir37"), std::string::npos);
}

TEST(PathConfig, SavedSettingsLoadBackIntoAnotherManager) {
    TempFolder tmp;
    ConfigManager config(tmp.path() / "trelm.ini");
    IPathConfigMgr paths;
    paths.SetRoot(tmp.path() / "root");
    paths.SetDir(APP_PLUGIN_DATA_DIR, tmp.path() / "cache");
    paths.SetAdditionalFolders({tmp.path() / "a", tmp.path() / "b"});
    ASSERT_TRUE(paths.SaveToConfig(config));

    IPathConfigMgr other;
    other.LoadFromConfig(config);
    EXPECT_EQ(other.GetRoot(), tmp.path() / "root");
    EXPECT_EQ(other.GetDir(37), tmp.path() / "cache");
    EXPECT_EQ(other.GetAdditionalFolders(), paths.GetAdditionalFolders());
}
