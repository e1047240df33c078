// Typed reads from scene-file JSON.
#include "json_read.h"

#include <cmath>

namespace TrelmSDK::json_read {

namespace {

bool Numbers(const nlohmann::json& obj, const char* key, const std::string& where, float* out,
             size_t minCount, size_t maxCount, std::string& error) {
    auto it = obj.find(key);
    if (it == obj.end()) return true;
    const auto& v = *it;
    auto bad = [&] {
        error = where + "." + key + ": expected an array of " + std::to_string(minCount) +
                (maxCount != minCount ? " or " + std::to_string(maxCount) : std::string()) +
                " numbers";
        return false;
    };
    if (!v.is_array() || v.size() < minCount || v.size() > maxCount) return bad();
    for (size_t i = 0; i < v.size(); ++i) {
        if (!v[i].is_number()) return bad();
        out[i] = v[i].get<float>();
        if (!std::isfinite(out[i])) return bad();
    }
    return true;
}

} // namespace

bool Float(const nlohmann::json& obj, const char* key, const std::string& where, float& out,
           std::string& error) {
    auto it = obj.find(key);
    if (it == obj.end()) return true;
    if (!it->is_number() || !std::isfinite(it->get<double>())) {
        error = where + "." + key + ": expected a number";
        return false;
    }
    out = it->get<float>();
    return true;
}

bool Int(const nlohmann::json& obj, const char* key, const std::string& where, int& out,
         std::string& error) {
    auto it = obj.find(key);
    if (it == obj.end()) return true;
    if (!it->is_number_integer()) {
        error = where + "." + key + ": expected a whole number";
        return false;
    }
    out = it->get<int>();
    return true;
}

bool Bool(const nlohmann::json& obj, const char* key, const std::string& where, bool& out,
          std::string& error) {
    auto it = obj.find(key);
    if (it == obj.end()) return true;
    if (!it->is_boolean()) {
        error = where + "." + key + ": expected true or false";
        return false;
    }
    out = it->get<bool>();
    return true;
}

bool String(const nlohmann::json& obj, const char* key, const std::string& where, std::string& out,
            std::string& error) {
    auto it = obj.find(key);
    if (it == obj.end()) return true;
    if (!it->is_string()) {
        error = where + "." + key + ": expected a string";
        return false;
    }
    out = it->get<std::string>();
    return true;
}

bool Vec3(const nlohmann::json& obj, const char* key, const std::string& where, Point3& out,
          std::string& error) {
    float v[3] = {out.x, out.y, out.z};
    if (!Numbers(obj, key, where, v, 3, 3, error)) return false;
    out = Point3(v[0], v[1], v[2]);
    return true;
}

bool Vec2(const nlohmann::json& obj, const char* key, const std::string& where, Point2& out,
          std::string& error) {
    float v[2] = {out.x, out.y};
    if (!Numbers(obj, key, where, v, 2, 2, error)) return false;
    out = Point2(v[0], v[1]);
    return true;
}

bool Colour(const nlohmann::json& obj, const char* key, const std::string& where, AColor& out,
            std::string& error) {
    float v[4] = {out.r, out.g, out.b, 1};
    if (!Numbers(obj, key, where, v, 3, 4, error)) return false;
    out = AColor(v[0], v[1], v[2], v[3]);
    return true;
}

bool Colour(const nlohmann::json& obj, const char* key, const std::string& where, Color& out,
            std::string& error) {
    float v[3] = {out.x, out.y, out.z};
    if (!Numbers(obj, key, where, v, 3, 3, error)) return false;
    out = Color(v[0], v[1], v[2]);
    return true;
}

bool OnlyKeys(const nlohmann::json& obj, std::initializer_list<const char*> allowed,
              const std::string& where, std::string& error) {
    for (auto it = obj.begin(); it != obj.end(); ++it) {
        bool known = false;
        for (const char* k : allowed) known |= it.key() == k;
        if (!known) {
            error = where + ": unknown entry '" + it.key() + "'";
            return false;
        }
    }
    return true;
}

} // namespace TrelmSDK::json_read
