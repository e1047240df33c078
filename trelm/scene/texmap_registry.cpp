// The registry of map classes, with the host's bitmap, checker and gradient classes.
#include <trelm/scene/bitmap_tex.h>
#include <trelm/scene/checker_tex.h>
#include <trelm/scene/gradient_tex.h>
#include <trelm/scene/texmap_registry.h>

#include "json_read.h"

namespace TrelmSDK {

namespace {

using nlohmann::json;
namespace jr = json_read;

bool ReadUVGen(const json& p, const std::string& where, UVGen& g, std::string& error) {
    Point2 tiling(g.uTiling, g.vTiling), offset(g.uOffset, g.vOffset);
    if (!jr::Int(p, "channel", where, g.channel, error) ||
        !jr::Vec2(p, "tiling", where, tiling, error) ||
        !jr::Vec2(p, "offset", where, offset, error) ||
        !jr::Float(p, "angle", where, g.wAngle, error))
        return false;
    if (g.channel < 0 || g.channel > 99) {
        error = where + ".channel: expected a mapping channel from 0 to 99";
        return false;
    }
    g.uTiling = tiling.x, g.vTiling = tiling.y, g.uOffset = offset.x, g.vOffset = offset.y;
    return true;
}

bool ReadCommon(const json& p, const std::string& where, MappedTexmap& m, std::string& error) {
    int gbuf = 0;
    if (!jr::Int(p, "gbuffer_id", where, gbuf, error)) return false;
    m.SetGBufID(gbuf);
    return ReadUVGen(p, where, m.uvGen, error);
}

const char* kUVKeys[] = {"channel", "tiling", "offset", "angle", "gbuffer_id"};

bool CheckKeys(const json& p, std::initializer_list<const char*> own, const std::string& where,
               std::string& error) {
    for (auto it = p.begin(); it != p.end(); ++it) {
        bool known = false;
        for (const char* k : own) known |= it.key() == k;
        for (const char* k : kUVKeys) known |= it.key() == k;
        if (!known) {
            error = where + ": unknown parameter '" + it.key() + "'";
            return false;
        }
    }
    return true;
}

std::shared_ptr<Texmap> MakeBitmap(const json& p, const MapLoadContext& ctx, std::string& error) {
    const std::string where = "params";
    auto m = std::make_shared<BitmapTex>();
    std::string file, filter = "smart";
    if (!CheckKeys(p, {"file", "tile_u", "tile_v", "filter", "colorspace", "alpha"}, where,
                   error) ||
        !ReadCommon(p, where, *m, error) || !jr::String(p, "file", where, file, error) ||
        !jr::Bool(p, "tile_u", where, m->tileU, error) ||
        !jr::Bool(p, "tile_v", where, m->tileV, error) ||
        !jr::String(p, "filter", where, filter, error) ||
        !jr::String(p, "colorspace", where, m->colorSpace, error) ||
        !jr::Bool(p, "alpha", where, m->alphaFromFile, error))
        return nullptr;
    if (file.empty()) {
        error = where + ".file: a bitmap needs an image file";
        return nullptr;
    }
    if (filter == "smart")
        m->filter = BitmapTex::Filter::Smart;
    else if (filter == "bilinear")
        m->filter = BitmapTex::Filter::Bilinear;
    else if (filter == "closest")
        m->filter = BitmapTex::Filter::Closest;
    else {
        error = where + ".filter: expected smart, bilinear or closest, not '" + filter + "'";
        return nullptr;
    }
    if (m->colorSpace != "automatic" && ColorPipelineManager::Canonical(m->colorSpace).empty()) {
        error = where + ".colorspace: unknown colour space '" + m->colorSpace + "'";
        return nullptr;
    }
    std::filesystem::path path(file);
    if (path.is_relative()) path = ctx.baseDir / path;
    m->SetFileName(path.lexically_normal().string());
    return m;
}

std::shared_ptr<Texmap> MakeChecker(const json& p, const MapLoadContext&, std::string& error) {
    const std::string where = "params";
    auto m = std::make_shared<CheckerTex>();
    if (!CheckKeys(p, {"color1", "color2"}, where, error) || !ReadCommon(p, where, *m, error) ||
        !jr::Colour(p, "color1", where, m->color1, error) ||
        !jr::Colour(p, "color2", where, m->color2, error))
        return nullptr;
    return m;
}

std::shared_ptr<Texmap> MakeGradient(const json& p, const MapLoadContext&, std::string& error) {
    const std::string where = "params";
    auto m = std::make_shared<GradientTex>();
    std::string type = "linear";
    if (!CheckKeys(p, {"color1", "color2", "color3", "color2_pos", "type"}, where, error) ||
        !ReadCommon(p, where, *m, error) || !jr::Colour(p, "color1", where, m->color1, error) ||
        !jr::Colour(p, "color2", where, m->color2, error) ||
        !jr::Colour(p, "color3", where, m->color3, error) ||
        !jr::Float(p, "color2_pos", where, m->color2Pos, error) ||
        !jr::String(p, "type", where, type, error))
        return nullptr;
    if (!(m->color2Pos > 0 && m->color2Pos < 1)) {
        error = where + ".color2_pos: expected a number between 0 and 1";
        return nullptr;
    }
    if (type == "linear")
        m->type = GradientTex::Type::Linear;
    else if (type == "radial")
        m->type = GradientTex::Type::Radial;
    else {
        error = where + ".type: expected linear or radial, not '" + type + "'";
        return nullptr;
    }
    return m;
}

} // namespace

TexmapRegistry::TexmapRegistry() {
    classes_.emplace_back("Bitmap", MakeBitmap);
    classes_.emplace_back("Checker", MakeChecker);
    classes_.emplace_back("Gradient", MakeGradient);
}

TexmapRegistry& TexmapRegistry::Instance() {
    static TexmapRegistry registry;
    return registry;
}

bool TexmapRegistry::Register(const std::string& className, TexmapCreator creator) {
    std::lock_guard<std::mutex> lock(mutex_);
    for (auto& [name, c] : classes_)
        if (name == className) return false;
    classes_.emplace_back(className, std::move(creator));
    return true;
}

TexmapCreator TexmapRegistry::Find(const std::string& className) const {
    std::lock_guard<std::mutex> lock(mutex_);
    for (auto& [name, c] : classes_)
        if (name == className) return c;
    return nullptr;
}

std::vector<std::string> TexmapRegistry::ClassNames() const {
    std::lock_guard<std::mutex> lock(mutex_);
    std::vector<std::string> names;
    for (auto& [name, c] : classes_) names.push_back(name);
    return names;
}

} // namespace TrelmSDK
