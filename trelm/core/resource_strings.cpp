// Per-module string tables.
#include <trelm/core/resource_strings.h>
#include <trelm/core/sdk_errors.h>

#include <algorithm>
#include <charconv>
#include <fstream>
#include <memory>
#include <mutex>
#include <shared_mutex>
#include <sstream>

namespace TrelmSDK {

struct ModuleInstance {
    MSTR name;
    std::map<int, MSTR> strings;
};

namespace {
struct Modules {
    // Tables are filled when modules load (main thread) and read from any thread afterwards.
    std::shared_mutex mutex;
    std::map<MSTR, std::unique_ptr<ModuleInstance>> byName;
};

Modules& AllModules() {
    static auto* modules = new Modules; // handles stay valid for the whole process
    return *modules;
}

bool Unescape(std::string_view in, std::string& out) {
    out.clear();
    for (size_t i = 0; i < in.size(); ++i) {
        if (in[i] != '\\') {
            out += in[i];
            continue;
        }
        if (++i == in.size()) return false;
        switch (in[i]) {
        case 'n':
            out += '\n';
            break;
        case 't':
            out += '\t';
            break;
        case '\\':
            out += '\\';
            break;
        default:
            return false;
        }
    }
    return true;
}
} // namespace

HINSTANCE RegisterModuleInstance(const MSTR& name) {
    auto& m = AllModules();
    std::unique_lock lock(m.mutex);
    auto& slot = m.byName[name];
    if (!slot) slot = std::make_unique<ModuleInstance>(ModuleInstance{name, {}});
    return slot.get();
}

MSTR ModuleInstanceName(HINSTANCE module) {
    if (!module) return {};
    std::shared_lock lock(AllModules().mutex);
    return module->name;
}

void SetResourceString(HINSTANCE module, int id, const MSTR& text) {
    if (!module) return;
    std::unique_lock lock(AllModules().mutex);
    module->strings[id] = text;
}

void SetResourceStrings(HINSTANCE module, const std::map<int, MSTR>& strings) {
    if (!module) return;
    std::unique_lock lock(AllModules().mutex);
    for (auto& [id, text] : strings) module->strings[id] = text;
}

bool LoadStringTableFile(HINSTANCE module, const std::string& path) {
    if (!module) return false;
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        ReportSDKError(L"String table '" + FromUTF8(path) + L"' cannot be opened");
        return false;
    }
    std::map<int, MSTR> parsed;
    std::string line, text;
    int lineNo = 0;
    while (std::getline(in, line)) {
        ++lineNo;
        if (!line.empty() && line.back() == '\r') line.pop_back();
        if (line.empty() || line[0] == '#') continue;
        auto tab = line.find('\t');
        int id = 0;
        auto [end, ec] = std::from_chars(line.data(), line.data() + std::min(tab, line.size()), id);
        bool ok = tab != std::string::npos && ec == std::errc() && end == line.data() + tab &&
                  Unescape(std::string_view(line).substr(tab + 1), text);
        if (!ok) {
            ReportSDKError(L"String table '" + FromUTF8(path) + L"', line " +
                           std::to_wstring(lineNo) +
                           L": expected a number, a tab and the text (escapes \\n \\t \\\\)");
            return false;
        }
        parsed[id] = FromUTF8(text);
    }
    SetResourceStrings(module, parsed);
    return true;
}

const MCHAR* GetResourceString(HINSTANCE module, int id) {
    if (!module) return nullptr;
    std::shared_lock lock(AllModules().mutex);
    auto it = module->strings.find(id);
    return it == module->strings.end() ? nullptr : it->second.c_str();
}

int LoadString(HINSTANCE module, int id, MCHAR* buffer, int bufferChars) {
    if (!buffer || bufferChars <= 0) return 0;
    buffer[0] = 0;
    if (!module) return 0;
    std::shared_lock lock(AllModules().mutex);
    auto it = module->strings.find(id);
    if (it == module->strings.end()) return 0;
    int n = std::min(static_cast<int>(it->second.size()), bufferChars - 1);
    std::copy_n(it->second.data(), n, buffer);
    buffer[n] = 0;
    return n;
}

} // namespace TrelmSDK
