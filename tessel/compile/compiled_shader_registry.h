// CompiledShaderRegistry: the process-wide table from SourceKey to shader description, with the
// compiler, the OSLCache folder of compiled bytecode and the include folders of shader scans.
#pragma once

#include "compile/oso_info.h"
#include "compile/source_key.h"

#include <OSL/oslconfig.h>
#include <trelm/core/notifications.h>

#include <atomic>
#include <filesystem>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace OSL {
class ShadingSystem;
}

// Cuts OSO text that carries stray bytes after its first "\n\tend\n", logging the cut; reason
// is "compiler" or "cache reload". Returns whether it cut.
bool RepairCompiledText(std::string& buffer, const char* reason);

// The message reported when an exception escapes a compilation (what is null for exceptions
// that are not standard ones): it quotes at most 1000 bytes of the source.
std::string CompileExceptionMessage(const char* what, std::string_view source);

// Threads: written on the main thread (and by the start-up registration thread, which runs
// while the main thread does not compile); render threads only read the shading system slot.
// There is no lock of its own.
class CompiledShaderRegistry {
public:
    static CompiledShaderRegistry& Instance();

    static SourceKey SourceKeyOf(std::string_view text) { return ::SourceKeyOf(text); }
    static std::string ShaderName(SourceKey key) { return ShaderNameOf(key); }

    // Compiles (or loads from the cache, or takes as bytecode) and records a description.
    // handler may be none (the shared OSLC_ErrorHandler is used); fileName names the source in
    // compiler messages.
    bool Compile(std::string source, OIIO::ErrorHandler* handler = nullptr,
                 const std::wstring& fileName = std::wstring());

    bool Contains(SourceKey key) const;
    std::shared_ptr<ParamBlockDesc2> Find(SourceKey key) const;
    std::string CompiledText(SourceKey key) const;
    std::string RecordedShaderName(SourceKey key) const;
    std::vector<MSTR> Names(SourceKey key) const;
    std::vector<MSTR> Labels(SourceKey key) const;
    std::vector<MSTR> OutputNames(SourceKey key) const;
    std::vector<MSTR> MapLabels(SourceKey key) const;
    int OutputIndex(SourceKey key, int output) const;
    std::string MetadataValue(SourceKey key, const std::string& param,
                              const std::string& item) const;
    std::shared_ptr<ParamBlockDesc2> DescriptorForVersion(SourceKey key, int version);
    // The description itself (for readers of types, metadata and mapNames), or none.
    std::shared_ptr<const OSOInfo> Description(SourceKey key) const;

    void AddIncludePath(const std::string& folderUtf8);
    std::vector<std::string> IncludePaths() const { return includePaths_; }
    // Deletes the cache file of a source file's text, or every cached file when none is given.
    void ClearCompiledCache(const std::optional<std::filesystem::path>& sourceFile = {});

    // The cache folder (directory 37 / OSLCache) and the cache file of a key.
    static std::filesystem::path CacheFolder();
    static std::filesystem::path CacheFile(SourceKey key);
    // The standard header given to the compiler (directory 20 / OSL / stdosl.h).
    static std::filesystem::path StdOslPath();

    // Set by notification 21, cleared by 94; read by the texture file watcher.
    bool WatcherFlag() const { return watcherFlag_.load(std::memory_order_relaxed); }

    // The key under which a description for an older save format is recorded.
    static SourceKey DerivedKey(SourceKey key, int version);

    // Number of times the compiler ran (cache hits and bytecode inputs do not count).
    int CompilerRuns() const { return compilerRuns_; }

    // The shading-system slot (Part of the runtime's state, held here): written once on the
    // main thread when the shading system is created, read by render threads afterwards.
    std::shared_ptr<OSL::ShadingSystem> shadingSystemOwner;
    OSL::ShadingSystem* shadingSystem = nullptr;

    ~CompiledShaderRegistry();

private:
    CompiledShaderRegistry();
    bool compileLoop(const std::string& source, OIIO::ErrorHandler* handler,
                     const std::wstring& fileName);
    static void OnNotification(void* param, NotifyInfo* info);

    std::map<SourceKey, std::shared_ptr<OSOInfo>> descriptions_;
    std::vector<std::string> includePaths_;
    std::atomic<bool> watcherFlag_{true};
    int compilerRuns_ = 0;
};
