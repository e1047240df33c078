// Arming the linked-file watcher and reloading the file when it changes on disk.
#include "map/linked_file_watcher.h"

#include "compile/compiled_shader_registry.h"
#include "compile/oslc_error_handler.h"
#include "map/map_resources.h"
#include "map/osl_tex.h"
#include "map/osl_tex_class_desc.h"

#include <QVersionNumber>
#include <trelm/core/hold.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <thread>

using namespace TrelmSDK;

namespace {

IFileChangeMonitor* FileMonitor() {
    return dynamic_cast<IFileChangeMonitor*>(
        GetCOREInterface(TrelmSDK::FILE_CHANGE_MONITOR_INTERFACE_ID));
}

QVersionNumber ParseVersion(const std::string& text) {
    return QVersionNumber::fromString(QString::fromStdString(text));
}

} // namespace

std::optional<std::string> ReadShaderFile(const MSTR& path) {
    std::error_code ec;
    const std::filesystem::path file(path);
    if (path.empty() || !std::filesystem::is_regular_file(file, ec)) return std::nullopt;
    std::ifstream in(file, std::ios::binary);
    if (!in) return std::nullopt;
    std::ostringstream text;
    text << in.rdbuf();
    if (in.bad()) return std::nullopt;
    return text.str();
}

int CompareShaderVersions(const std::string& a, const std::string& b) {
    return QVersionNumber::compare(ParseVersion(a), ParseVersion(b));
}

MSTR ResolveLinkedShaderPath(const MSTR& stored) {
    std::error_code ec;
    if (!stored.empty() && std::filesystem::is_regular_file(std::filesystem::path(stored), ec))
        return stored;
    return {};
}

void OSLTex::ArmLinkedFileWatcher() {
    watchedKey_ = key_;
    DisarmLinkedFileWatcher();
    if (!fixedBlock_ || fixedBlock_->GetInt(kOSLAutoUpdate, 0) == 0) return;
    const MSTR path = ResolveLinkedShaderPath(fixedBlock_->GetStr(kOSLPath, 0));
    if (path.empty()) return;
    if (IFileChangeMonitor* monitor = FileMonitor())
        watchHandle_ = monitor->AddWatch(path, &OSLTex::OnLinkedFileChanged, this);
}

void OSLTex::DisarmLinkedFileWatcher() {
    if (watchHandle_ == 0) return;
    if (IFileChangeMonitor* monitor = FileMonitor()) monitor->RemoveWatch(watchHandle_);
    watchHandle_ = 0;
}

void OSLTex::OnLinkedFileChanged(const MSTR& path, void* param) {
    IFileChangeMonitor* monitor = FileMonitor();
    if (monitor && !monitor->IsEnabled()) return;
    static_cast<OSLTex*>(param)->ReloadLinkedFile(path);
}

void OSLTex::ReloadLinkedFile(const MSTR& path) {
    std::optional<std::string> text = ReadShaderFile(path);
    if (!text || text->empty()) {
        // An editor may have truncated the file and not yet written it again.
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        text = ReadShaderFile(path);
        if (!text || text->empty()) return;
    }
    CompiledShaderRegistry& registry = CompiledShaderRegistry::Instance();
    const SourceKey key = registry.SourceKeyOf(*text);
    if (key == key_) return;
    if (!registry.Contains(key)) registry.Compile(*text, nullptr, path);
    if (!registry.Contains(key)) {
        std::string message = "Error compiling ";
        message.append(ToUTF8(path)).append("\nFile will not be auto-loaded.\n");
        SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_ERROR, message);
        return;
    }
    if (FromUTF8(registry.RecordedShaderName(key)) != shaderName_) return;
    const std::string current = registry.MetadataValue(key_, "", "version");
    const std::string incoming = registry.MetadataValue(key, "", "version");
    if (!current.empty() && CompareShaderVersions(incoming, current) < 0) return;

    // Setting the path it already holds changes nothing in the block, so load it directly.
    if (fixedBlock_->GetStr(kOSLPath, 0) == path)
        LoadLinkedFile(path);
    else
        fixedBlock_->SetValue(kOSLPath, 0, path);
}

void OSLTex::LoadLinkedFile(const MSTR& path) {
    if (path.empty()) return;
    std::optional<std::string> text = ReadShaderFile(path);
    if (!text) {
        std::string message = "Cannot read the shader file \"";
        message.append(ToUTF8(path)).append("\"");
        SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_WARNING, message);
        return;
    }
    const int autoUpdate = fixedBlock_->GetInt(kOSLAutoUpdate, 0);
    theHold.Begin();
    fixedBlock_->SetValue(kOSLCode, 0, FromUTF8(*text));
    fixedBlock_->SetValue(kOSLAutoUpdate, 0, autoUpdate != 0);
    fixedBlock_->RefreshUI();
    theHold.Accept(MapString(kResUndoShaderChange));
}
