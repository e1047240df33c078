// Map classes by name, so that scene files can create maps: the host's own classes are known
// from the start, and a plug-in adds its classes at load time.
#pragma once

#include <trelm/core/texmap.h>

#include <nlohmann/json_fwd.hpp>

#include <filesystem>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace TrelmSDK {

struct MapLoadContext {
    std::filesystem::path baseDir; // relative file names are resolved against it
};

// Makes a map from its parameters; returns null and sets error (naming the parameter) on bad input.
using TexmapCreator = std::function<std::shared_ptr<Texmap>(
    const nlohmann::json& params, const MapLoadContext& ctx, std::string& error)>;

class TexmapRegistry {
public:
    static TexmapRegistry& Instance();

    // False when the name is taken.
    bool Register(const std::string& className, TexmapCreator creator);
    // Null when no class has that name.
    TexmapCreator Find(const std::string& className) const;
    std::vector<std::string> ClassNames() const;

private:
    TexmapRegistry();
    mutable std::mutex mutex_; // classes may be registered from a plug-in's loading thread
    std::vector<std::pair<std::string, TexmapCreator>> classes_;
};

} // namespace TrelmSDK
