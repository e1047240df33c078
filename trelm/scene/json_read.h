// Typed reads from scene-file JSON with messages that name the offending entry.
#pragma once

#include <trelm/scene/geom_types.h>

#include <nlohmann/json.hpp>

#include <string>

namespace TrelmSDK::json_read {

// Each reader leaves out untouched and returns true when key is absent; on a value of the wrong
// type it sets error to "<where>.<key>: <what is expected>" and returns false.
bool Float(const nlohmann::json& obj, const char* key, const std::string& where, float& out,
           std::string& error);
bool Int(const nlohmann::json& obj, const char* key, const std::string& where, int& out,
         std::string& error);
bool Bool(const nlohmann::json& obj, const char* key, const std::string& where, bool& out,
          std::string& error);
bool String(const nlohmann::json& obj, const char* key, const std::string& where, std::string& out,
            std::string& error);
bool Vec3(const nlohmann::json& obj, const char* key, const std::string& where, Point3& out,
          std::string& error);
bool Vec2(const nlohmann::json& obj, const char* key, const std::string& where, Point2& out,
          std::string& error);
// Three or four numbers; a missing fourth leaves alpha at 1.
bool Colour(const nlohmann::json& obj, const char* key, const std::string& where, AColor& out,
            std::string& error);
bool Colour(const nlohmann::json& obj, const char* key, const std::string& where, Color& out,
            std::string& error);

// Rejects keys not in allowed, so that a misspelt parameter is reported instead of ignored.
bool OnlyKeys(const nlohmann::json& obj, std::initializer_list<const char*> allowed,
              const std::string& where, std::string& error);

} // namespace TrelmSDK::json_read
