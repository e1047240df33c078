// The host configuration over an INI file: typed keys, defaults written back, atomic saves.
#include <trelm/config/config_manager.h>
#include <trelm/log/system_log.h>

#include <atomic>
#include <cerrno>
#include <charconv>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <pwd.h>
#include <sstream>
#include <sys/stat.h>
#include <unistd.h>

namespace TrelmSDK {

namespace {

constexpr std::string_view kLogTitle = "Configuration";

std::string_view trimBlanks(std::string_view s) {
    while (!s.empty() && (s.front() == ' ' || s.front() == '\t')) s.remove_prefix(1);
    while (!s.empty() && (s.back() == ' ' || s.back() == '\t')) s.remove_suffix(1);
    return s;
}

std::filesystem::path homeFolder() {
    if (const char* home = std::getenv("HOME"); home && *home) return home;
    if (const passwd* entry = getpwuid(getuid()); entry && entry->pw_dir) return entry->pw_dir;
    return {};
}

std::string errnoText(int code) {
    return std::strerror(code);
}

// Writes `text` to a new file beside `target` and renames it over `target`, so that readers
// see either the old or the new file, never a half-written one.
bool writeAtomically(const std::filesystem::path& target, const std::string& text,
                     std::string& error) {
    static std::atomic<unsigned> counter{0};
    std::error_code ec;
    const std::filesystem::path folder = target.parent_path();
    if (!folder.empty()) {
        std::filesystem::create_directories(folder, ec);
        if (ec) {
            error = "cannot create folder " + folder.string() + ": " + ec.message();
            return false;
        }
    }
    mode_t mode = 0644;
    struct stat existing {};
    if (::stat(target.c_str(), &existing) == 0) mode = existing.st_mode & 07777;

    std::filesystem::path temp = target;
    temp += ".tmp." + std::to_string(::getpid()) + "." + std::to_string(counter++);
    const int fd = ::open(temp.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, mode);
    if (fd < 0) {
        error = "cannot create " + temp.string() + ": " + errnoText(errno);
        return false;
    }
    const char* data = text.data();
    std::size_t left = text.size();
    while (left > 0) {
        const ssize_t written = ::write(fd, data, left);
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) {
            error = "cannot write " + temp.string() + ": " + errnoText(errno);
            ::close(fd);
            ::unlink(temp.c_str());
            return false;
        }
        data += written;
        left -= static_cast<std::size_t>(written);
    }
    if (::fsync(fd) != 0 || ::close(fd) != 0) {
        error = "cannot flush " + temp.string() + ": " + errnoText(errno);
        ::unlink(temp.c_str());
        return false;
    }
    if (::rename(temp.c_str(), target.c_str()) != 0) {
        error = "cannot replace " + target.string() + ": " + errnoText(errno);
        ::unlink(temp.c_str());
        return false;
    }
    if (const int dir = ::open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY);
        dir >= 0) {
        ::fsync(dir);
        ::close(dir);
    }
    return true;
}

} // namespace

std::filesystem::path DefaultConfigFilePath() {
    if (const char* file = std::getenv("TRELM_CONFIG"); file && *file) return file;
    if (const char* xdg = std::getenv("XDG_CONFIG_HOME"); xdg && *xdg && xdg[0] == '/')
        return std::filesystem::path(xdg) / "trelm" / "trelm.ini";
    const std::filesystem::path home = homeFolder();
    if (home.empty()) return "trelm.ini";
    return home / ".config" / "trelm" / "trelm.ini";
}

ConfigManager::ConfigManager(std::filesystem::path file) : file_(std::move(file)) {}

std::filesystem::path ConfigManager::FilePath() const {
    std::lock_guard lock(mutex_);
    return file_;
}

void ConfigManager::SetFilePath(std::filesystem::path file) {
    std::lock_guard lock(mutex_);
    file_ = std::move(file);
    loaded_ = false;
    dirty_ = false;
    warned_.clear();
}

ConfigManager::FileStamp ConfigManager::stampOf(const std::filesystem::path& file) {
    struct stat info {};
    if (::stat(file.c_str(), &info) != 0) return {};
    return {true, info.st_dev, info.st_ino, info.st_size,
            static_cast<long long>(info.st_mtim.tv_sec) * 1000000000LL + info.st_mtim.tv_nsec};
}

bool ConfigManager::reloadLocked() const {
    loaded_ = true;
    lastError_.clear();
    // The stamp is taken before reading: a change during the read is seen by the next check.
    stamp_ = stampOf(file_);
    if (!stamp_.exists) {
        document_.Parse("");
        return true;
    }
    std::ifstream in(file_, std::ios::binary);
    std::ostringstream text;
    if (!in || !(text << in.rdbuf())) {
        std::error_code ec;
        if (std::filesystem::file_size(file_, ec) == 0 && !ec) {
            document_.Parse("");
            return true;
        }
        document_.Parse("");
        lastError_ = "cannot read " + file_.string();
        GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, kLogTitle, lastError_);
        return false;
    }
    document_.Parse(text.str());
    for (const IniIssue& issue : document_.Issues())
        GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, kLogTitle,
                                file_.string() + " line " + std::to_string(issue.line) + ": " +
                                    issue.message + "; the line is kept and ignored");
    return true;
}

void ConfigManager::refreshLocked() const {
    // Unsaved changes win over the file; otherwise a file changed on disk is read again.
    if (!loaded_ || (!dirty_ && stampOf(file_) != stamp_)) reloadLocked();
}

bool ConfigManager::saveLocked() {
    std::filesystem::path target = file_;
    std::error_code ec;
    // Saving through a symbolic link replaces the file it points to, not the link.
    if (std::filesystem::is_symlink(target, ec)) {
        const std::filesystem::path canonical = std::filesystem::weakly_canonical(target, ec);
        if (!ec) target = canonical;
    }
    std::string error;
    if (!writeAtomically(target, document_.Serialize(), error)) {
        lastError_ = "cannot save configuration: " + error;
        GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, kLogTitle, lastError_);
        return false;
    }
    dirty_ = false;
    stamp_ = stampOf(file_);
    return true;
}

bool ConfigManager::Reload() {
    std::lock_guard lock(mutex_);
    dirty_ = false;
    return reloadLocked();
}

bool ConfigManager::Save() {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return saveLocked();
}

void ConfigManager::SetAutoSave(bool on) {
    std::lock_guard lock(mutex_);
    autoSave_ = on;
}

std::string ConfigManager::LastError() const {
    std::lock_guard lock(mutex_);
    return lastError_;
}

std::vector<IniIssue> ConfigManager::Issues() const {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return document_.Issues();
}

bool ConfigManager::HasSection(std::string_view section) const {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return document_.HasSection(section);
}

bool ConfigManager::HasKey(std::string_view section, std::string_view key) const {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return document_.HasKey(section, key);
}

std::vector<std::string> ConfigManager::Sections() const {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return document_.Sections();
}

std::vector<std::string> ConfigManager::Keys(std::string_view section) const {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return document_.Keys(section);
}

std::optional<int> ConfigManager::ParseInt(std::string_view text) {
    text = trimBlanks(text);
    if (text.starts_with('+')) text.remove_prefix(1);
    int value = 0;
    const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (ec != std::errc() || end != text.data() + text.size() || text.empty()) return std::nullopt;
    return value;
}

std::optional<float> ConfigManager::ParseFloat(std::string_view text) {
    text = trimBlanks(text);
    if (text.starts_with('+')) text.remove_prefix(1);
    float value = 0;
    const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (ec != std::errc() || end != text.data() + text.size() || text.empty()) return std::nullopt;
    return value;
}

std::string ConfigManager::FormatFloat(float value) {
    char buffer[64];
    const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
    std::string text(buffer, result.ptr);
    // Keep floats recognisable as such in the file: 16384 is written 16384.0.
    if (text.find_first_not_of("-0123456789") == std::string::npos) text += ".0";
    return text;
}

std::optional<int> ConfigManager::GetInt(std::string_view section, std::string_view key) const {
    const auto text = GetString(section, key);
    return text ? ParseInt(*text) : std::nullopt;
}

std::optional<float> ConfigManager::GetFloat(std::string_view section, std::string_view key) const {
    const auto text = GetString(section, key);
    return text ? ParseFloat(*text) : std::nullopt;
}

std::optional<std::string> ConfigManager::GetString(std::string_view section,
                                                    std::string_view key) const {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return document_.Get(section, key);
}

void ConfigManager::warnMalformedLocked(std::string_view section, std::string_view key,
                                        const std::string& text, std::string_view type,
                                        const std::string& defaultText) const {
    std::string id = std::string(section) + '\n' + std::string(key) + '\n' + text;
    if (!warned_.insert(std::move(id)).second) return;
    GetSystemLog().LogEntry(SYSLOG_WARN, NO_DIALOG, kLogTitle,
                            file_.string() + ": [" + std::string(section) + "] " +
                                std::string(key) + " = \"" + text + "\" is not " +
                                std::string(type) + "; using " + defaultText);
}

bool ConfigManager::setLocked(std::string_view section, std::string_view key,
                              const std::string& text) {
    if (!document_.Set(section, key, text)) {
        lastError_ = "cannot set [" + std::string(section) + "] " + std::string(key) +
                     ": unusable section or key name, or a line break in the value";
        return false;
    }
    dirty_ = true;
    return !autoSave_ || saveLocked();
}

int ConfigManager::ReadInt(std::string_view section, std::string_view key, int defaultValue) {
    std::lock_guard lock(mutex_);
    refreshLocked();
    const auto text = document_.Get(section, key);
    if (!text) {
        setLocked(section, key, std::to_string(defaultValue));
        return defaultValue;
    }
    if (const auto value = ParseInt(*text)) return *value;
    warnMalformedLocked(section, key, *text, "an integer", std::to_string(defaultValue));
    return defaultValue;
}

float ConfigManager::ReadFloat(std::string_view section, std::string_view key, float defaultValue) {
    std::lock_guard lock(mutex_);
    refreshLocked();
    const auto text = document_.Get(section, key);
    if (!text) {
        setLocked(section, key, FormatFloat(defaultValue));
        return defaultValue;
    }
    if (const auto value = ParseFloat(*text)) return *value;
    warnMalformedLocked(section, key, *text, "a number", FormatFloat(defaultValue));
    return defaultValue;
}

std::string ConfigManager::ReadString(std::string_view section, std::string_view key,
                                      std::string_view defaultValue) {
    std::lock_guard lock(mutex_);
    refreshLocked();
    if (auto text = document_.Get(section, key)) return *text;
    setLocked(section, key, std::string(defaultValue));
    return std::string(defaultValue);
}

bool ConfigManager::SetInt(std::string_view section, std::string_view key, int value) {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return setLocked(section, key, std::to_string(value));
}

bool ConfigManager::SetFloat(std::string_view section, std::string_view key, float value) {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return setLocked(section, key, FormatFloat(value));
}

bool ConfigManager::SetString(std::string_view section, std::string_view key,
                              std::string_view value) {
    std::lock_guard lock(mutex_);
    refreshLocked();
    return setLocked(section, key, std::string(value));
}

bool ConfigManager::RemoveKey(std::string_view section, std::string_view key) {
    std::lock_guard lock(mutex_);
    refreshLocked();
    if (!document_.Remove(section, key)) return false;
    dirty_ = true;
    return !autoSave_ || saveLocked();
}

ConfigSection ConfigManager::Section(std::string_view name) {
    return ConfigSection(*this, std::string(name));
}

ConfigManager& GetConfigManager() {
    // Never destroyed: other static objects may read settings while the process exits.
    static ConfigManager* manager = new ConfigManager;
    return *manager;
}

} // namespace TrelmSDK
