// Numbered host directories under a configurable root, created on demand.
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

std::vector<std::filesystem::path> splitFolderList(std::string_view list) {
    std::vector<std::filesystem::path> folders;
    while (!list.empty()) {
        const auto colon = list.find(':');
        const std::string_view part = list.substr(0, colon);
        if (!part.empty()) folders.emplace_back(part);
        if (colon == std::string_view::npos) break;
        list.remove_prefix(colon + 1);
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
    static IPathConfigMgr manager;
    return &manager;
}

IPathConfigMgr::IPathConfigMgr() : root_(DefaultTrelmRoot()) {
    if (const char* list = std::getenv("TRELM_ADDITIONAL_FOLDERS"))
        additional_ = splitFolderList(list);
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
