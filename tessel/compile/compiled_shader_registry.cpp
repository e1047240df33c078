// The compiled-shader registry: compilation, the bytecode cache and the description table.
#include "compile/compiled_shader_registry.h"

#include "compile/oslc_error_handler.h"
#include "runtime/shading_system.h"

#include <OSL/oslcomp.h>
#include <OSL/oslexec.h>
#include <trelm/config/path_config.h>
#include <trelm/core/locale_guard.h>
#include <trelm/core/mstr.h>
#include <trelm/log/system_log.h>

#include <cstdio>
#include <exception>
#include <fstream>
#include <sstream>
#include <system_error>

namespace fs = std::filesystem;

namespace {

constexpr std::string_view kOsoMagic = "OpenShadingLanguage 1.00";
constexpr int kNotificationCodes[] = {57, 94, 21, 132, 238};

bool ReadWholeFile(const fs::path& file, std::string& out) {
    std::ifstream in(file, std::ios::binary);
    if (!in) return false;
    std::ostringstream text;
    text << in.rdbuf();
    if (in.bad()) return false;
    out = text.str();
    return true;
}

// Puts the standard headers the compiler is given into directory 20's OSL folder when the host
// installation lacks them, so that compilation finds stdosl.h where the host keeps it.
void InstallStandardHeaders() {
#ifdef TESSEL_OSL_SHADER_DIR
    const fs::path target = CompiledShaderRegistry::StdOslPath().parent_path();
    std::error_code ec;
    if (fs::exists(target / "stdosl.h", ec)) return;
    fs::create_directories(target, ec);
    for (const auto& entry : fs::directory_iterator(TESSEL_OSL_SHADER_DIR, ec)) {
        if (entry.path().extension() != ".h") continue;
        fs::copy_file(entry.path(), target / entry.path().filename(),
                      fs::copy_options::skip_existing, ec);
    }
#endif
}

} // namespace

bool RepairCompiledText(std::string& buffer, const char* reason) {
    const size_t found = buffer.find("\n\tend\n");
    if (found == std::string::npos) return false;
    const size_t p = found + 6;
    if (p == 0 || p >= buffer.size()) return false;
    char line[256];
    std::snprintf(line, sizeof line, "OSO corruption mitigation kicked in after %s.", reason);
    TrelmSDK::GetSystemLog().LogEntry(TrelmSDK::SYSLOG_WARN, TrelmSDK::NO_DIALOG, kOSLLogTitle,
                                      line);
    TrelmSDK::DebugPrint(std::string("OSO corruption detected after ") + reason + ":\n" + buffer);
    buffer.resize(p);
    return true;
}

std::string CompileExceptionMessage(const char* what, std::string_view source) {
    const std::string quote(source.substr(0, 1000));
    if (what)
        return "Exception " + std::string(what) + " occurred attempting to compile this code:\n" +
               quote + "...\n";
    return "Unknown Exception occurred attempting to compile this code:\n" + quote + "...\n";
}

CompiledShaderRegistry& CompiledShaderRegistry::Instance() {
    // Lives until the process ends: module unload is the end of the process here.
    static CompiledShaderRegistry* registry = new CompiledShaderRegistry;
    return *registry;
}

CompiledShaderRegistry::CompiledShaderRegistry() {
    for (int code : kNotificationCodes) RegisterNotification(&OnNotification, this, code);
    InstallStandardHeaders();
}

CompiledShaderRegistry::~CompiledShaderRegistry() {
    UnRegisterNotification(&OnNotification, this);
    shadingSystem = nullptr;
    shadingSystemOwner.reset();
}

void CompiledShaderRegistry::OnNotification(void* param, NotifyInfo* info) {
    auto* self = static_cast<CompiledShaderRegistry*>(param);
    if (!info) return;
    switch (info->intcode) {
    case 21:
        self->watcherFlag_ = true;
        break;
    case 94:
        self->watcherFlag_ = false;
        break;
    default:
        HandleRuntimeNotification(*self, info->intcode, info->callParam);
        break;
    }
}

fs::path CompiledShaderRegistry::CacheFolder() {
    return IPathConfigMgr::GetPathConfigMgr()->GetDir(TrelmSDK::APP_PLUGIN_DATA_DIR) / "OSLCache";
}

fs::path CompiledShaderRegistry::CacheFile(SourceKey key) {
    return CacheFolder() / (ShaderName(key) + ".oso");
}

fs::path CompiledShaderRegistry::StdOslPath() {
    return IPathConfigMgr::GetPathConfigMgr()->GetDir(TrelmSDK::APP_SYSTEM_ROOT_DIR) / "OSL" /
           "stdosl.h";
}

SourceKey CompiledShaderRegistry::DerivedKey(SourceKey key, int version) {
    const auto shifted = static_cast<std::int32_t>(static_cast<std::uint32_t>(version) << 16);
    return static_cast<SourceKey>(static_cast<std::int64_t>(shifted)) ^ key;
}

bool CompiledShaderRegistry::Compile(std::string source, OIIO::ErrorHandler* handler,
                                     const std::wstring& fileName) {
    TrelmSDK::LocaleGuard cLocale("C");
    try {
        return compileLoop(source, handler, fileName);
    } catch (const std::exception& e) {
        SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_ERROR,
                                 CompileExceptionMessage(e.what(), source));
    } catch (...) {
        SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_ERROR,
                                 CompileExceptionMessage(nullptr, source));
    }
    return false;
}

bool CompiledShaderRegistry::compileLoop(const std::string& source, OIIO::ErrorHandler* handler,
                                         const std::wstring& fileName) {
    const SourceKey key = SourceKeyOf(source);
    std::error_code ec;
    fs::create_directories(CacheFolder(), ec);
    const fs::path cacheFile = CacheFile(key);

    std::string buffer;
    if (ReadWholeFile(cacheFile, buffer)) RepairCompiledText(buffer, "cache reload");

    for (int attemptsLeft = 3;;) {
        if (buffer.empty()) {
            if (source.compare(0, kOsoMagic.size(), kOsoMagic) != 0) {
                OSL::OSLCompiler compiler(handler ? handler : &SharedOSLCErrorHandler());
                std::vector<std::string> options;
                for (const std::string& path : includePaths_) options.push_back("-I" + path);
                ++compilerRuns_;
                if (!compiler.compile_buffer(source, buffer, options, StdOslPath().string(),
                                             TrelmSDK::ToUTF8(fileName)))
                    return false;
            } else {
                buffer = source;
            }
            RepairCompiledText(buffer, "compiler");
            std::ofstream out(cacheFile, std::ios::binary | std::ios::trunc);
            out.write(buffer.data(), static_cast<std::streamsize>(buffer.size()));
        }
        OSL::ShadingSystem* ss = GetShadingSystem(*this);
        if (ss && ss->LoadMemoryCompiledShader(ShaderName(key), buffer)) {
            descriptions_[key] = std::make_shared<OSOInfo>(buffer, key, kShaderFormatCurrent);
            return true;
        }
        if (--attemptsLeft < 1) break;
        buffer.clear();
    }
    SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_ERROR,
                             "Could not load compiled buffer from \"" + RecordedShaderName(key) +
                                 "\"");
    return false;
}

bool CompiledShaderRegistry::Contains(SourceKey key) const {
    return descriptions_.count(key) != 0;
}

std::shared_ptr<const OSOInfo> CompiledShaderRegistry::Description(SourceKey key) const {
    auto it = descriptions_.find(key);
    return it == descriptions_.end() ? nullptr : it->second;
}

std::shared_ptr<ParamBlockDesc2> CompiledShaderRegistry::Find(SourceKey key) const {
    auto info = Description(key);
    return info ? info->blockDesc : nullptr;
}

std::string CompiledShaderRegistry::CompiledText(SourceKey key) const {
    auto info = Description(key);
    return info ? info->osoText : std::string();
}

std::string CompiledShaderRegistry::RecordedShaderName(SourceKey key) const {
    auto info = Description(key);
    return info ? info->shaderName : std::string();
}

std::vector<MSTR> CompiledShaderRegistry::Names(SourceKey key) const {
    auto info = Description(key);
    return info ? info->names : std::vector<MSTR>();
}

std::vector<MSTR> CompiledShaderRegistry::Labels(SourceKey key) const {
    auto info = Description(key);
    return info ? info->labels : std::vector<MSTR>();
}

std::vector<MSTR> CompiledShaderRegistry::OutputNames(SourceKey key) const {
    auto info = Description(key);
    return info ? info->outputNames : std::vector<MSTR>();
}

std::vector<MSTR> CompiledShaderRegistry::MapLabels(SourceKey key) const {
    auto info = Description(key);
    return info ? info->mapLabels : std::vector<MSTR>{kNoValidOutput};
}

int CompiledShaderRegistry::OutputIndex(SourceKey key, int output) const {
    auto info = Description(key);
    if (!info || output < 0 || static_cast<size_t>(output) >= info->outputIndices.size()) return -1;
    return info->outputIndices[static_cast<size_t>(output)];
}

std::string CompiledShaderRegistry::MetadataValue(SourceKey key, const std::string& param,
                                                  const std::string& item) const {
    auto info = Description(key);
    if (!info) return {};
    auto p = info->metadata.find(param);
    if (p == info->metadata.end()) return {};
    auto it = p->second.find(item);
    return it == p->second.end() ? std::string() : it->second;
}

std::shared_ptr<ParamBlockDesc2> CompiledShaderRegistry::DescriptorForVersion(SourceKey key,
                                                                              int version) {
    const SourceKey derived = DerivedKey(key, version);
    if (auto known = Description(derived)) return known->blockDesc;
    auto info = std::make_shared<OSOInfo>(CompiledText(key), derived, version);
    descriptions_[derived] = info;
    return info->blockDesc;
}

void CompiledShaderRegistry::AddIncludePath(const std::string& folderUtf8) {
    includePaths_.push_back(folderUtf8);
}

void CompiledShaderRegistry::ClearCompiledCache(const std::optional<fs::path>& sourceFile) {
    std::error_code ec;
    if (sourceFile) {
        std::string text;
        if (ReadWholeFile(*sourceFile, text)) fs::remove(CacheFile(SourceKeyOf(text)), ec);
        return;
    }
    for (const auto& entry : fs::directory_iterator(CacheFolder(), ec))
        if (entry.is_regular_file(ec) && entry.path().extension() == ".oso")
            fs::remove(entry.path(), ec);
}
