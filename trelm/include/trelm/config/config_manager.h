// The host's configuration: a real INI file of sections and typed keys that the user may edit,
// where a key read with a default and found missing gets that default written back.
#pragma once

#include <trelm/config/ini_document.h>

#include <filesystem>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

namespace TrelmSDK {

class ConfigSection;

// The default file: $TRELM_CONFIG when set, else $XDG_CONFIG_HOME/trelm/trelm.ini, else
// ~/.config/trelm/trelm.ini.
std::filesystem::path DefaultConfigFilePath();

// Thread-safety: every operation takes the manager's mutex, so any thread may use it, but the
// operations touch the disk and belong on the main thread and in set-up code, never in render
// or shading paths (read the values once and keep them).
//
// The file is read on first use and read again whenever it changed on disk (checked on every
// operation), so edits the user makes while the host runs are seen. Each change is saved at
// once, atomically (a temporary file beside it, then a rename), rewriting only the changed
// lines. Lines the manager does not understand are kept and reported once to the system log.
// Reading and writing numbers does not depend on the process locale.
class ConfigManager {
public:
    explicit ConfigManager(std::filesystem::path file = DefaultConfigFilePath());
    ConfigManager(const ConfigManager&) = delete;
    ConfigManager& operator=(const ConfigManager&) = delete;

    std::filesystem::path FilePath() const;
    // Switches to another file; it is read on the next operation. Unsaved changes are dropped.
    void SetFilePath(std::filesystem::path file);

    // Reads the file again now. A missing file is an empty configuration; false when the file
    // exists but cannot be read (the configuration is then empty and LastError says why).
    bool Reload();
    // Writes the configuration now; false (with LastError) when the file cannot be written.
    bool Save();
    // With auto-save off, changes stay in memory until Save (a batch of writes saves once).
    void SetAutoSave(bool on);
    std::string LastError() const;
    // The lines of the last read that were not understood.
    std::vector<IniIssue> Issues() const;

    bool HasSection(std::string_view section) const;
    bool HasKey(std::string_view section, std::string_view key) const;
    std::vector<std::string> Sections() const;
    std::vector<std::string> Keys(std::string_view section) const;

    // Typed reads without side effects: nothing when the key is missing or its text is not a
    // value of the type (an int is decimal digits with an optional sign; a float is a decimal
    // or scientific number with '.' as the decimal point).
    std::optional<int> GetInt(std::string_view section, std::string_view key) const;
    std::optional<float> GetFloat(std::string_view section, std::string_view key) const;
    std::optional<std::string> GetString(std::string_view section, std::string_view key) const;

    // Reads with a default: a missing key gets the default written (and saved); a key whose
    // text is not of the type keeps the user's text, gets a warning in the system log and the
    // default is returned.
    int ReadInt(std::string_view section, std::string_view key, int defaultValue);
    float ReadFloat(std::string_view section, std::string_view key, float defaultValue);
    std::string ReadString(std::string_view section, std::string_view key,
                           std::string_view defaultValue);

    // Writes; false when the section or key name is unusable, a string holds a line break, or
    // the file cannot be saved (the value is then kept in memory and saved with the next change).
    bool SetInt(std::string_view section, std::string_view key, int value);
    bool SetFloat(std::string_view section, std::string_view key, float value);
    bool SetString(std::string_view section, std::string_view key, std::string_view value);
    bool RemoveKey(std::string_view section, std::string_view key);

    ConfigSection Section(std::string_view name);

    static std::string FormatFloat(float value);
    static std::optional<int> ParseInt(std::string_view text);
    static std::optional<float> ParseFloat(std::string_view text);

private:
    struct FileStamp {
        bool exists = false;
        dev_t device = 0;
        ino_t inode = 0;
        off_t size = 0;
        long long mtimeNs = 0;
        bool operator==(const FileStamp&) const = default;
    };
    static FileStamp stampOf(const std::filesystem::path& file);

    void refreshLocked() const;
    bool reloadLocked() const;
    bool saveLocked();
    bool setLocked(std::string_view section, std::string_view key, const std::string& text);
    void warnMalformedLocked(std::string_view section, std::string_view key,
                             const std::string& text, std::string_view type,
                             const std::string& defaultText) const;

    // All state is guarded by mutex_; the document is a cache of the file, hence mutable.
    mutable std::mutex mutex_;
    std::filesystem::path file_;
    mutable IniDocument document_;
    mutable FileStamp stamp_;
    mutable bool loaded_ = false;
    mutable std::string lastError_;
    mutable std::set<std::string> warned_;
    bool dirty_ = false;
    bool autoSave_ = true;
};

// A section of a configuration, as the module opens one ("OSL", "OpenImageIO").
class ConfigSection {
public:
    ConfigSection(ConfigManager& manager, std::string name)
        : manager_(&manager), name_(std::move(name)) {}

    const std::string& Name() const { return name_; }
    bool HasKey(std::string_view key) const { return manager_->HasKey(name_, key); }
    std::vector<std::string> Keys() const { return manager_->Keys(name_); }
    std::optional<int> GetInt(std::string_view key) const { return manager_->GetInt(name_, key); }
    std::optional<float> GetFloat(std::string_view key) const {
        return manager_->GetFloat(name_, key);
    }
    std::optional<std::string> GetString(std::string_view key) const {
        return manager_->GetString(name_, key);
    }
    int ReadInt(std::string_view key, int def) { return manager_->ReadInt(name_, key, def); }
    float ReadFloat(std::string_view key, float def) {
        return manager_->ReadFloat(name_, key, def);
    }
    std::string ReadString(std::string_view key, std::string_view def) {
        return manager_->ReadString(name_, key, def);
    }
    bool SetInt(std::string_view key, int v) { return manager_->SetInt(name_, key, v); }
    bool SetFloat(std::string_view key, float v) { return manager_->SetFloat(name_, key, v); }
    bool SetString(std::string_view key, std::string_view v) {
        return manager_->SetString(name_, key, v);
    }

private:
    ConfigManager* manager_;
    std::string name_;
};

// The host's configuration ("trelm.ini"), on DefaultConfigFilePath() until SetFilePath.
ConfigManager& GetConfigManager();

} // namespace TrelmSDK

using TrelmSDK::ConfigManager;
