// The host's path configuration: numbered directories under one configurable root, the user
// folder, and the additional folder list that shader and plug-in scans walk.
#pragma once

#include <filesystem>
#include <map>
#include <mutex>
#include <set>
#include <vector>

namespace TrelmSDK {

class ConfigManager;

// Directory identifiers. 20 and 37 are the ones the module asks for; the others serve the host.
enum : int {
    APP_SCENE_DIR = 1,          // scenes: <root>/scenes
    APP_IMAGE_DIR = 7,          // bitmaps and textures: <root>/images
    APP_RENDER_OUTPUT_DIR = 11, // rendered images: <root>/renderoutput
    APP_SYSTEM_ROOT_DIR = 20,   // the application's own files: <root> itself; OSL/ holds
                                // stdosl.h and the shaders installed with the host
    APP_LOG_DIR = 22,           // log files: <root>/logs
    APP_TEMP_DIR = 23,          // scratch files: <root>/temp
    APP_PLUGIN_DATA_DIR = 37,   // plug-ins' writable data (caches, crash guards): <root>/plugcfg
};

// User folders (GetUserDir).
enum : int {
    USER_DOCUMENTS_DIR = 1, // the user's own Trelm documents: <root>/user
};

// The root is, in order: SetRoot's argument, $TRELM_ROOT, $XDG_DATA_HOME/trelm, or
// ~/.local/share/trelm. $TRELM_ADDITIONAL_FOLDERS (':'-separated) seeds the additional list.
//
// Thread-safe (one mutex): set-up and the main thread change it, and the start-up registration
// thread may ask for directories meanwhile.
class IPathConfigMgr {
public:
    static IPathConfigMgr* GetPathConfigMgr();

    IPathConfigMgr();

    // The folder of a directory identifier, created when missing; an empty path for an unknown
    // identifier. A folder that cannot be created is still returned (callers that write there
    // report their own failure) and the failure is noted once in the system log.
    std::filesystem::path GetDir(int which) const;
    std::filesystem::path GetUserDir(int which) const;

    std::filesystem::path GetRoot() const;
    // Moves every directory not set on its own under the new root (an empty path restores the
    // default root).
    void SetRoot(std::filesystem::path root);
    // Points one identifier at a folder of its own; an empty path returns it under the root.
    // False for an unknown identifier.
    bool SetDir(int which, std::filesystem::path folder);
    static bool IsKnownDir(int which);

    // Applies the section "Directories" of a configuration, which the user may edit: "Root" (the
    // root folder), "Dir<N>" (a folder of its own for identifier N, e.g. Dir20) and
    // "AdditionalFolders" (folders separated by ';'). Relative paths are taken from the
    // configuration file's folder. Missing keys leave the current setting and nothing is written
    // back, so an unset root keeps following the environment. Unusable keys are reported to the
    // system log and skipped.
    void LoadFromConfig(ConfigManager& config);
    // Writes the current root, own folders and additional folders into that section.
    bool SaveToConfig(ConfigManager& config) const;

    std::vector<std::filesystem::path> GetAdditionalFolders() const;
    void SetAdditionalFolders(std::vector<std::filesystem::path> folders);
    void AddAdditionalFolder(std::filesystem::path folder);

private:
    std::filesystem::path resolveLocked(int which) const;
    std::filesystem::path ensureLocked(std::filesystem::path folder) const;

    mutable std::mutex mutex_; // guards everything below
    std::filesystem::path root_;
    std::map<int, std::filesystem::path> overrides_;
    std::vector<std::filesystem::path> additional_;
    mutable std::set<std::filesystem::path> reported_; // folders whose creation failed
};

std::filesystem::path DefaultTrelmRoot();

} // namespace TrelmSDK

using TrelmSDK::IPathConfigMgr;
