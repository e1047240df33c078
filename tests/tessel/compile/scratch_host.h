// Points the host's directories and configuration at a fresh scratch folder once per test
// process, before the registry or the shading system exist.
#pragma once

#include <trelm/config/config_manager.h>
#include <trelm/config/path_config.h>

#include <cstdlib>
#include <filesystem>
#include <string>
#include <unistd.h>

inline const std::filesystem::path& ScratchHostRoot() {
    static const std::filesystem::path root = [] {
        std::string pattern =
            (std::filesystem::temp_directory_path() / "tessel-pipeline-XXXXXX").string();
        const char* made = mkdtemp(pattern.data());
        std::filesystem::path dir = made ? std::filesystem::path(made)
                                         : std::filesystem::temp_directory_path() / "tessel-pl";
        unsetenv("TRELM_OSL_OPT");
        IPathConfigMgr::GetPathConfigMgr()->SetRoot(dir / "root");
        TrelmSDK::GetConfigManager().SetFilePath(dir / "trelm.ini");
        return dir;
    }();
    return root;
}
