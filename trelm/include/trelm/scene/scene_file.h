// Scene files: JSON text listing render settings, camera, lights, maps (by class and
// parameters), materials and nodes. Also the built-in scene renders use without a file.
#pragma once

#include <trelm/scene/scene.h>

#include <filesystem>
#include <memory>
#include <string>

namespace TrelmSDK {

// Null with error set ("<file>: <where>: <what>") when the file cannot be read or is not a
// valid scene; nothing is changed elsewhere then, except the colour pipeline settings, which a
// successfully loaded file applies.
std::unique_ptr<Scene> LoadSceneFile(const std::filesystem::path& path, std::string& error);
std::unique_ptr<Scene> LoadSceneText(const std::string& text, const std::filesystem::path& baseDir,
                                     std::string& error);

// A sphere standing on a plane under a perspective camera with two lights. The plane has a
// checker map; the sphere has the bitmap in texturePath when given, else a gradient.
std::unique_ptr<Scene> MakeBuiltinScene(const std::string& texturePath = {});

} // namespace TrelmSDK
