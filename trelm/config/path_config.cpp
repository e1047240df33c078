// Numbered host directories under a configurable root, created on demand.
#include <trelm/config/config_manager.h>
#include <trelm/config/path_config.h>
#include <trelm/log/system_log.h>

#include <cstdlib>
#include <pwd.h>
#include <string_view>
#include <unistd.h>

namespace TrelmSDK {

namespace {

// Folder of each identifier relative to the root ("" is the root itself).
const std::map<int, std::string_view>& dirTable() {
    static const std::map<int, std::string_view> table = {
        {APP_SCENE_DIR, "scenes"},
        {APP_IMAGE_DIR, "images"},
        {APP_RENDER_OUTPUT_DIR, "renderoutput"},
        {APP_SYSTEM_ROOT_DIR, ""},
        {APP_LOG_DIR, "logs"},
        {APP_TEMP_DIR, "temp"},
        {APP_PLUGIN_DATA_DIR, "plugcfg"},
    };
    return table;
}

constexpr std::string_view kSection = "Directories";

std::vector<std::filesystem::path> splitFolderList(std::string_view list, char separator) {
    std::vector<std::filesystem::path> folders;
    while (!list.empty()) {
        const auto at = list.find(separator);
        std::string_view part = list.substr(0, at);
        while (!part.empty() && part.front() == ' ') part.remove_prefix(1);
        while (!part.empty() && part.back() == ' ') part.remove_suffix(1);
        if (!part.empty()) folders.emplace_back(part);
        if (at == std::string_view::npos) break;
        list.remove_prefix(at + 1);
    }
    return folders;
}

} // namespace

std::filesystem::path DefaultTrelmRoot() {
    if (const char* root = std::getenv("TRELM_ROOT"); root && *root) return root;
    if (const char* xdg = std::getenv("XDG_DATA_HOME"); xdg && xdg[0] == '/')
        return std::filesystem::path(xdg) / "trelm";
    std::filesystem::path home;
    if (const char* env = std::getenv("HOME"); env && *env)
        home = env;
    else if (const passwd* entry = getpwuid(getuid()); entry && entry->pw_dir)
        home = entry->pw_dir;
    if (home.empty()) return std::filesystem::current_path() / "trelm";
    return home / ".local" / "share" / "trelm";
}

IPathConfigMgr* IPathConfigMgr::GetPathConfigMgr() {
    // Never destroyed: background threads may ask for folders while the process exits.
    static IPathConfigMgr* manager = new IPathConfigMgr;
    return manager;
}

IPathConfigMgr::IPathConfigMgr() : root_(DefaultTrelmRoot()) {
    if (const char* list = std::getenv("TRELM_ADDITIONAL_FOLDERS"))
        additional_ = splitFolderList(list, ':');
}

bool IPathConfigMgr::IsKnownDir(int which) {
    return dirTable().contains(which);
}

std::filesystem::path IPathConfigMgr::resolveLocked(int which) const {
    if (const auto it = overrides_.find(which); it != overrides_.end()) return it->second;
    const auto it = dirTable().find(which);
    if (it == dirTable().end()) return {};
    return it->second.empty() ? root_ : root_ / it->second;
}

std::filesystem::path IPathConfigMgr::ensureLocked(std::filesystem::path folder) const {
    std::error_code ec;
    if (!folder.empty() && !std::filesystem::is_directory(folder, ec)) {
        std::filesystem::create_directories(folder, ec);
        if (ec && reported_.insert(folder).second)
            GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, "Paths",
                                    "cannot create folder " + folder.string() + ": " +
                                        ec.message());
    }
    return folder;
}

std::filesystem::path IPathConfigMgr::GetDir(int which) const {
    std::lock_guard lock(mutex_);
    return ensureLocked(resolveLocked(which));
}

std::filesystem::path IPathConfigMgr::GetUserDir(int which) const {
    std::lock_guard lock(mutex_);
    if (which != USER_DOCUMENTS_DIR) return {};
    return ensureLocked(root_ / "user");
}

std::filesystem::path IPathConfigMgr::GetRoot() const {
    std::lock_guard lock(mutex_);
    return root_;
}

void IPathConfigMgr::SetRoot(std::filesystem::path root) {
    std::lock_guard lock(mutex_);
    root_ = root.empty() ? DefaultTrelmRoot() : std::move(root);
}

bool IPathConfigMgr::SetDir(int which, std::filesystem::path folder) {
    if (!IsKnownDir(which)) return false;
    std::lock_guard lock(mutex_);
    if (folder.empty())
        overrides_.erase(which);
    else
        overrides_[which] = std::move(folder);
    return true;
}

void IPathConfigMgr::LoadFromConfig(ConfigManager& config) {
    const std::filesystem::path base = config.FilePath().parent_path();
    auto resolve = [&base](const std::string& text) {
        const std::filesystem::path path(text);
        return path.is_absolute() || base.empty() ? path : base / path;
    };
    std::lock_guard lock(mutex_);
    for (const std::string& key : config.Keys(kSection)) {
        const std::string value = config.GetString(kSection, key).value_or("");
        std::string lowered;
        for (char c : key) lowered += static_cast<char>((c >= 'A' && c <= 'Z') ? c - 'A' + 'a' : c);
        if (lowered == "root") {
            if (!value.empty()) root_ = resolve(value);
        } else if (lowered == "additionalfolders") {
            additional_.clear();
            for (const auto& folder : splitFolderList(value, ';'))
                additional_.push_back(resolve(folder.string()));
        } else if (lowered.starts_with("dir") &&
                   ConfigManager::ParseInt(std::string_view(key).substr(3)) &&
                   IsKnownDir(*ConfigManager::ParseInt(std::string_view(key).substr(3)))) {
            const int which = *ConfigManager::ParseInt(std::string_view(key).substr(3));
            if (value.empty())
                overrides_.erase(which);
            else
                overrides_[which] = resolve(value);
        } else {
            GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, "Paths",
                                    config.FilePath().string() + ": [" + std::string(kSection) +
                                        "] " + key + " is not a known directory setting");
        }
    }
}

bool IPathConfigMgr::SaveToConfig(ConfigManager& config) const {
    std::string root, additional;
    std::map<int, std::filesystem::path> overrides;
    {
        std::lock_guard lock(mutex_);
        root = root_.string();
        overrides = overrides_;
        for (const auto& folder : additional_) {
            if (!additional.empty()) additional += ';';
            additional += folder.string();
        }
    }
    bool ok = config.SetString(kSection, "Root", root);
    for (const auto& [which, folder] : overrides)
        ok = config.SetString(kSection, "Dir" + std::to_string(which), folder.string()) && ok;
    return config.SetString(kSection, "AdditionalFolders", additional) && ok;
}

std::vector<std::filesystem::path> IPathConfigMgr::GetAdditionalFolders() const {
    std::lock_guard lock(mutex_);
    return additional_;
}

void IPathConfigMgr::SetAdditionalFolders(std::vector<std::filesystem::path> folders) {
    std::lock_guard lock(mutex_);
    additional_ = std::move(folders);
}

void IPathConfigMgr::AddAdditionalFolder(std::filesystem::path folder) {
    std::lock_guard lock(mutex_);
    additional_.push_back(std::move(folder));
}

} // namespace TrelmSDK
