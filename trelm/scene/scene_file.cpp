// Reading scene files: JSON with render settings, camera, lights, maps, materials and nodes.
#include <trelm/scene/color_pipeline.h>
#include <trelm/scene/particle_system.h>
#include <trelm/scene/primitives.h>
#include <trelm/scene/scene_file.h>
#include <trelm/scene/texmap_registry.h>
#include <trelm/scene/tri_mesh.h>

#include "json_read.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <fstream>
#include <functional>
#include <set>
#include <sstream>

namespace TrelmSDK {

namespace {

using nlohmann::json;
namespace jr = json_read;

constexpr int kFormatVersion = 1;

std::string Index(const char* list, size_t i) {
    return std::string(list) + "[" + std::to_string(i) + "]";
}

std::string Lower(std::string s) {
    for (char& c : s) c = char(std::tolower(static_cast<unsigned char>(c)));
    return s;
}

// Everything a file sets on the colour pipeline, applied only once the whole file is good.
struct ColourSettings {
    bool management = true;
    std::string renderingSpace = "linear";
};

class Loader {
public:
    Loader(const std::filesystem::path& baseDir) : baseDir_(baseDir) {}

    std::unique_ptr<Scene> Load(const json& root, std::string& error) {
        if (!root.is_object()) return Fail("the file must hold a JSON object", error);
        if (!jr::OnlyKeys(root,
                          {"format", "version", "render", "camera", "colour", "ambient", "lights",
                           "maps", "materials", "nodes"},
                          "scene", error))
            return nullptr;
        std::string format;
        int version = kFormatVersion;
        if (!jr::String(root, "format", "scene", format, error) ||
            !jr::Int(root, "version", "scene", version, error))
            return nullptr;
        if (format != "trelm-scene") return Fail("scene.format: expected \"trelm-scene\"", error);
        if (version < 1 || version > kFormatVersion)
            return Fail("scene.version: version " + std::to_string(version) +
                            " is not supported (this program reads up to " +
                            std::to_string(kFormatVersion) + ")",
                        error);
        scene_ = std::make_unique<Scene>();
        if (!ReadRender(root, error) || !ReadCamera(root, error) || !ReadColour(root, error) ||
            !ReadLights(root, error) || !ReadMaps(root, error) || !ReadMaterials(root, error) ||
            !ReadNodes(root, error))
            return nullptr;
        ColorPipelineManager& cm = GetColorPipelineMgr();
        cm.SetColorManagementActive(colour_.management);
        cm.SetRenderingSpace(colour_.renderingSpace);
        return std::move(scene_);
    }

private:
    std::unique_ptr<Scene> Fail(const std::string& what, std::string& error) {
        error = what;
        return nullptr;
    }
    bool Bad(const std::string& what, std::string& error) {
        error = what;
        return false;
    }
    // The member of root, which must be an object (or absent: null).
    bool Section(const json& root, const char* key, const json*& out, std::string& error,
                 bool array = false) {
        out = nullptr;
        auto it = root.find(key);
        if (it == root.end()) return true;
        if (array ? !it->is_array() : !it->is_object())
            return Bad(std::string(key) + (array ? ": expected an array" : ": expected an object"),
                       error);
        out = &*it;
        return true;
    }

    bool ReadRender(const json& root, std::string& error) {
        const json* r;
        if (!Section(root, "render", r, error) || !r) return r || error.empty();
        RenderSettings& s = scene_->settings;
        const std::string w = "render";
        std::string type = "normal";
        std::vector<float> region;
        int frame = 0;
        bool hasFrame = r->contains("frame");
        if (!jr::OnlyKeys(*r,
                          {"width", "height", "pixel_aspect", "type", "region", "frame", "samples",
                           "max_depth", "maps", "shadows", "background"},
                          w, error) ||
            !jr::Int(*r, "width", w, s.width, error) ||
            !jr::Int(*r, "height", w, s.height, error) ||
            !jr::Float(*r, "pixel_aspect", w, s.pixelAspect, error) ||
            !jr::String(*r, "type", w, type, error) || !jr::Int(*r, "frame", w, frame, error) ||
            !jr::Int(*r, "samples", w, s.samplesPerAxis, error) ||
            !jr::Int(*r, "max_depth", w, s.maxRayDepth, error) ||
            !jr::Bool(*r, "maps", w, s.mapsEnabled, error) ||
            !jr::Bool(*r, "shadows", w, s.shadows, error) ||
            !jr::Colour(*r, "background", w, s.background, error))
            return false;
        if (s.width < 1 || s.height < 1 || s.width > 16384 || s.height > 16384)
            return Bad("render: width and height must be between 1 and 16384", error);
        if (!(s.pixelAspect > 0)) return Bad("render.pixel_aspect: must be above 0", error);
        if (s.samplesPerAxis < 1 || s.samplesPerAxis > 16)
            return Bad("render.samples: must be between 1 and 16", error);
        if (s.maxRayDepth < 0) return Bad("render.max_depth: must not be negative", error);
        if (hasFrame) s.time = frame * GetTicksPerFrame();
        if (type == "normal")
            s.type = RENDTYPE_NORMAL;
        else if (type == "region")
            s.type = RENDTYPE_REGION;
        else if (type == "region_crop")
            s.type = RENDTYPE_REGION_CROP;
        else
            return Bad("render.type: expected normal, region or region_crop, not '" + type + "'",
                       error);
        if (auto it = r->find("region"); it != r->end()) {
            if (!it->is_array() || it->size() != 4)
                return Bad("render.region: expected four numbers x0, y0, x1, y1", error);
            float v[4];
            for (int i = 0; i < 4; ++i) {
                if (!(*it)[i].is_number())
                    return Bad("render.region: expected four numbers x0, y0, x1, y1", error);
                v[i] = (*it)[i].get<float>();
            }
            if (!(v[0] >= 0 && v[1] >= 0 && v[2] <= 1 && v[3] <= 1 && v[0] < v[2] && v[1] < v[3]))
                return Bad("render.region: needs 0 <= x0 < x1 <= 1 and 0 <= y0 < y1 <= 1", error);
            s.region = {v[0], v[1], v[2], v[3]};
        }
        return true;
    }

    bool ReadCamera(const json& root, std::string& error) {
        const json* c;
        if (!Section(root, "camera", c, error) || !c) return error.empty();
        ViewCamera& cam = scene_->camera;
        const std::string w = "camera";
        std::string projection = "perspective";
        float fovDeg = cam.fov * float(180.0 / M_PI);
        Point3 pos(0, -10, 5), target(0), up(0, 0, 1);
        if (!jr::OnlyKeys(*c,
                          {"projection", "fov", "width", "near", "far", "position", "target", "up"},
                          w, error) ||
            !jr::String(*c, "projection", w, projection, error) ||
            !jr::Float(*c, "fov", w, fovDeg, error) ||
            !jr::Float(*c, "width", w, cam.orthoWidth, error) ||
            !jr::Float(*c, "near", w, cam.clipNear, error) ||
            !jr::Float(*c, "far", w, cam.clipFar, error) ||
            !jr::Vec3(*c, "position", w, pos, error) || !jr::Vec3(*c, "target", w, target, error) ||
            !jr::Vec3(*c, "up", w, up, error))
            return false;
        if (projection != "perspective" && projection != "orthographic")
            return Bad("camera.projection: expected perspective or orthographic, not '" +
                           projection + "'",
                       error);
        if (!(fovDeg > 0 && fovDeg < 180))
            return Bad("camera.fov: must be between 0 and 180 degrees", error);
        if (!(cam.orthoWidth > 0)) return Bad("camera.width: must be above 0", error);
        if (!(cam.clipNear >= 0 && cam.clipFar > cam.clipNear))
            return Bad("camera: needs 0 <= near < far", error);
        if ((pos - target).length2() == 0)
            return Bad("camera: position and target must differ", error);
        cam.perspective = projection == "perspective";
        cam.fov = fovDeg * float(M_PI / 180.0);
        cam.LookAt(pos, target, up);
        return true;
    }

    bool ReadColour(const json& root, std::string& error) {
        const json* c;
        if (!Section(root, "colour", c, error) || !c) return error.empty();
        const std::string w = "colour";
        if (!jr::OnlyKeys(*c, {"management", "rendering_space"}, w, error) ||
            !jr::Bool(*c, "management", w, colour_.management, error) ||
            !jr::String(*c, "rendering_space", w, colour_.renderingSpace, error))
            return false;
        const std::string canon = ColorPipelineManager::Canonical(colour_.renderingSpace);
        if (canon.empty() || canon == "raw")
            return Bad("colour.rendering_space: '" + colour_.renderingSpace +
                           "' is not a rendering space (use linear, ACEScg or sRGB)",
                       error);
        return true;
    }

    bool ReadLights(const json& root, std::string& error) {
        if (!jr::Colour(root, "ambient", "scene", scene_->ambient, error)) return false;
        const json* list;
        if (!Section(root, "lights", list, error, true) || !list) return error.empty();
        for (size_t i = 0; i < list->size(); ++i) {
            const json& l = (*list)[i];
            const std::string w = Index("lights", i);
            if (!l.is_object()) return Bad(w + ": expected an object", error);
            Light light;
            std::string type = "directional";
            if (!jr::OnlyKeys(l, {"type", "position", "direction", "color", "intensity", "shadows"},
                              w, error) ||
                !jr::String(l, "type", w, type, error) ||
                !jr::Vec3(l, "position", w, light.position, error) ||
                !jr::Vec3(l, "direction", w, light.direction, error) ||
                !jr::Colour(l, "color", w, light.color, error) ||
                !jr::Float(l, "intensity", w, light.intensity, error) ||
                !jr::Bool(l, "shadows", w, light.castShadows, error))
                return false;
            if (type == "directional")
                light.kind = Light::DIRECTIONAL;
            else if (type == "point")
                light.kind = Light::POINT;
            else
                return Bad(w + ".type: expected directional or point, not '" + type + "'", error);
            if (light.kind == Light::DIRECTIONAL) {
                if (light.direction.length2() == 0)
                    return Bad(w + ".direction: must not be zero", error);
                light.direction.normalize();
            }
            scene_->lights.push_back(light);
        }
        return true;
    }

    bool ReadMaps(const json& root, std::string& error) {
        const json* list;
        if (!Section(root, "maps", list, error, true) || !list) return error.empty();
        MapLoadContext ctx{baseDir_};
        std::vector<const json*> slotLists(list->size(), nullptr);
        for (size_t i = 0; i < list->size(); ++i) {
            const json& m = (*list)[i];
            const std::string w = Index("maps", i);
            if (!m.is_object()) return Bad(w + ": expected an object", error);
            std::string name, cls;
            if (!jr::OnlyKeys(m, {"name", "class", "params", "slots"}, w, error) ||
                !jr::String(m, "name", w, name, error) || !jr::String(m, "class", w, cls, error))
                return false;
            if (name.empty()) return Bad(w + ".name: every map needs a name", error);
            if (scene_->FindMap(name))
                return Bad(w + ".name: a map named '" + name + "' exists already", error);
            TexmapCreator create = TexmapRegistry::Instance().Find(cls);
            if (!create) {
                std::string known;
                for (auto& n : TexmapRegistry::Instance().ClassNames())
                    known += (known.empty() ? "" : ", ") + n;
                return Bad(w + ".class: unknown map class '" + cls + "' (known: " + known + ")",
                           error);
            }
            const json empty = json::object();
            const json* params = &empty;
            if (auto it = m.find("params"); it != m.end()) {
                if (!it->is_object()) return Bad(w + ".params: expected an object", error);
                params = &*it;
            }
            std::string why;
            std::shared_ptr<Texmap> map = create(*params, ctx, why);
            if (!map) return Bad(w + "." + (why.empty() ? "params: rejected" : why), error);
            map->SetName(FromUTF8(name));
            scene_->AddMap(map);
            if (auto it = m.find("slots"); it != m.end()) {
                if (!it->is_object()) return Bad(w + ".slots: expected an object", error);
                slotLists[i] = &*it;
            }
        }
        // Slots are connected once every map exists, so that maps may refer forwards.
        for (size_t i = 0; i < list->size(); ++i) {
            if (!slotLists[i]) continue;
            Texmap* map = scene_->Maps()[i].get();
            for (auto it = slotLists[i]->begin(); it != slotLists[i]->end(); ++it) {
                const std::string w = Index("maps", i) + ".slots." + it.key();
                const int slot = FindSlot(*map, it.key());
                if (slot < 0) return Bad(w + ": the map has no such slot", error);
                if (!it->is_string()) return Bad(w + ": expected the name of a map", error);
                Texmap* sub = scene_->FindMap(it->get<std::string>());
                if (!sub) return Bad(w + ": no map named '" + it->get<std::string>() + "'", error);
                map->SetSubTexmap(slot, sub);
            }
        }
        for (size_t i = 0; i < scene_->Maps().size(); ++i)
            if (ContainsItself(scene_->Maps()[i].get()))
                return Bad(Index("maps", i) + ".slots: map '" +
                               ToUTF8(scene_->Maps()[i]->GetName()) + "' would contain itself",
                           error);
        return true;
    }

    static int FindSlot(Texmap& map, const std::string& key) {
        for (int s = 0; s < map.NumSubTexmaps(); ++s)
            if (Lower(ToUTF8(map.GetSubTexmapSlotName(s))) == Lower(key) ||
                std::to_string(s) == key)
                return s;
        return -1;
    }

    static bool ContainsItself(Texmap* root) {
        std::set<Texmap*> onPath;
        std::function<bool(Texmap*)> visit = [&](Texmap* m) {
            if (!onPath.insert(m).second) return true;
            for (int s = 0; s < m->NumSubTexmaps(); ++s)
                if (Texmap* sub = m->GetSubTexmap(s); sub && visit(sub)) return true;
            onPath.erase(m);
            return false;
        };
        return visit(root);
    }

    bool MapRef(const json& obj, const char* key, const std::string& w, Texmap*& out,
                std::string& error) {
        std::string name;
        if (!jr::String(obj, key, w, name, error)) return false;
        if (name.empty()) return true;
        out = scene_->FindMap(name);
        if (!out) return Bad(w + "." + key + ": no map named '" + name + "'", error);
        return true;
    }

    bool ReadMaterials(const json& root, std::string& error) {
        const json* list;
        if (!Section(root, "materials", list, error, true) || !list) return error.empty();
        for (size_t i = 0; i < list->size(); ++i) {
            const json& m = (*list)[i];
            const std::string w = Index("materials", i);
            if (!m.is_object()) return Bad(w + ": expected an object", error);
            std::string name;
            if (!jr::String(m, "name", w, name, error)) return false;
            if (name.empty()) return Bad(w + ".name: every material needs a name", error);
            if (scene_->FindMaterial(name))
                return Bad(w + ".name: a material named '" + name + "' exists already", error);
            Material mtl;
            Texmap *diffuseMap = nullptr, *bumpMap = nullptr;
            if (!jr::OnlyKeys(m,
                              {"name", "diffuse", "diffuse_map", "diffuse_amount", "bump_map",
                               "bump_amount", "specular", "glossiness"},
                              w, error) ||
                !jr::Colour(m, "diffuse", w, mtl.diffuse, error) ||
                !MapRef(m, "diffuse_map", w, diffuseMap, error) ||
                !jr::Float(m, "diffuse_amount", w, mtl.diffuseMapAmount, error) ||
                !MapRef(m, "bump_map", w, bumpMap, error) ||
                !jr::Float(m, "bump_amount", w, mtl.bumpAmount, error) ||
                !jr::Colour(m, "specular", w, mtl.specular, error) ||
                !jr::Float(m, "glossiness", w, mtl.glossiness, error))
                return false;
            Material* out = scene_->CreateMaterial(name);
            *out = mtl;
            out->name = name;
            out->SetSubTexmap(Material::DIFFUSE_SLOT, diffuseMap);
            out->SetSubTexmap(Material::BUMP_SLOT, bumpMap);
        }
        return true;
    }

    bool ReadGeometry(const json& g, const std::string& w, std::shared_ptr<Object>& out,
                      std::string& error) {
        if (!g.is_object()) return Bad(w + ": expected an object", error);
        std::string type;
        if (!jr::String(g, "type", w, type, error)) return false;
        if (type == "plane") {
            float width = 10, length = 10;
            if (!jr::OnlyKeys(g, {"type", "width", "length"}, w, error) ||
                !jr::Float(g, "width", w, width, error) ||
                !jr::Float(g, "length", w, length, error))
                return false;
            if (!(width > 0 && length > 0))
                return Bad(w + ": width and length must be above 0", error);
            out = std::make_shared<PlaneObject>(width, length);
        } else if (type == "sphere") {
            float radius = 1;
            if (!jr::OnlyKeys(g, {"type", "radius"}, w, error) ||
                !jr::Float(g, "radius", w, radius, error))
                return false;
            if (!(radius > 0)) return Bad(w + ".radius: must be above 0", error);
            out = std::make_shared<SphereObject>(radius);
        } else if (type == "box") {
            Point3 size(1);
            if (!jr::OnlyKeys(g, {"type", "size"}, w, error) ||
                !jr::Vec3(g, "size", w, size, error))
                return false;
            if (!(size.x > 0 && size.y > 0 && size.z > 0))
                return Bad(w + ".size: every side must be above 0", error);
            out = std::make_shared<BoxObject>(size);
        } else if (type == "mesh") {
            std::string file;
            if (!jr::OnlyKeys(g, {"type", "file"}, w, error) ||
                !jr::String(g, "file", w, file, error))
                return false;
            if (file.empty()) return Bad(w + ".file: a mesh needs an OBJ file", error);
            std::filesystem::path path(file);
            if (path.is_relative()) path = baseDir_ / path;
            std::string why;
            auto mesh = TriMesh::LoadOBJ(path.lexically_normal().string(), why);
            if (!mesh) return Bad(w + ".file: " + why, error);
            out = std::move(mesh);
        } else if (type == "particles") {
            ParticleSystem::Params p;
            float emitStart = 0, emitStop = 1, life = 1;
            int seed = 1;
            if (!jr::OnlyKeys(g,
                              {"type", "count", "emit_start", "emit_stop", "life", "life_variation",
                               "speed", "spread", "gravity", "size", "seed"},
                              w, error) ||
                !jr::Int(g, "count", w, p.count, error) ||
                !jr::Float(g, "emit_start", w, emitStart, error) ||
                !jr::Float(g, "emit_stop", w, emitStop, error) ||
                !jr::Float(g, "life", w, life, error) ||
                !jr::Float(g, "life_variation", w, p.lifeVariation, error) ||
                !jr::Float(g, "speed", w, p.speed, error) ||
                !jr::Float(g, "spread", w, p.spread, error) ||
                !jr::Float(g, "gravity", w, p.gravity, error) ||
                !jr::Float(g, "size", w, p.size, error) || !jr::Int(g, "seed", w, seed, error))
                return false;
            if (p.count < 0 || p.count > 1000000)
                return Bad(w + ".count: must be between 0 and 1000000", error);
            if (!(life > 0) || !(emitStop >= emitStart) || !(p.size > 0) ||
                !(p.lifeVariation >= 0 && p.lifeVariation < 1))
                return Bad(w + ": needs life > 0, emit_stop >= emit_start, size > 0 and "
                               "0 <= life_variation < 1",
                           error);
            // Times in the file are in seconds.
            p.emitStart = TimeValue(std::lround(emitStart * TICKS_PER_SECOND));
            p.emitStop = TimeValue(std::lround(emitStop * TICKS_PER_SECOND));
            p.life = TimeValue(std::lround(life * TICKS_PER_SECOND));
            p.seed = unsigned(seed);
            out = std::make_shared<ParticleSystem>(p);
        } else {
            return Bad(w + ".type: unknown geometry '" + type +
                           "' (expected plane, sphere, box, mesh or particles)",
                       error);
        }
        return true;
    }

    static bool ReadWireColour(const json& n, const std::string& w, uint32_t& out,
                               std::string& error) {
        auto it = n.find("wire_color");
        if (it == n.end()) return true;
        if (it->is_string()) {
            const std::string s = it->get<std::string>();
            if (s.size() == 7 && s[0] == '#' && std::all_of(s.begin() + 1, s.end(), [](char c) {
                    return std::isxdigit(static_cast<unsigned char>(c));
                })) {
                const unsigned long rgb = std::stoul(s.substr(1), nullptr, 16);
                out = uint32_t(((rgb >> 16) & 0xFF) | (rgb & 0xFF00) | ((rgb & 0xFF) << 16));
                return true;
            }
        } else if (it->is_array() && it->size() == 3) {
            uint32_t c = 0;
            for (int i = 0; i < 3; ++i) {
                if (!(*it)[i].is_number_integer() || (*it)[i].get<int>() < 0 ||
                    (*it)[i].get<int>() > 255)
                    goto bad;
                c |= uint32_t((*it)[i].get<int>()) << (8 * i);
            }
            out = c;
            return true;
        }
    bad:
        error = w + ".wire_color: expected \"#RRGGBB\" or three whole numbers from 0 to 255";
        return false;
    }

    bool ReadNodes(const json& root, std::string& error) {
        const json* list;
        if (!Section(root, "nodes", list, error, true) || !list) return error.empty();
        for (size_t i = 0; i < list->size(); ++i) {
            const json& n = (*list)[i];
            const std::string w = Index("nodes", i);
            if (!n.is_object()) return Bad(w + ": expected an object", error);
            std::string name, mtlName, props;
            int renderID = -1, gbufID = 0;
            bool renderable = true;
            uint32_t wire = 0x00808080;
            Point3 pos(0), rot(0), scale(1);
            if (!jr::OnlyKeys(n,
                              {"name", "geometry", "material", "position", "rotation", "scale",
                               "render_id", "gbuffer_id", "wire_color", "user_properties",
                               "renderable", "channels"},
                              w, error) ||
                !jr::String(n, "name", w, name, error) ||
                !jr::String(n, "material", w, mtlName, error) ||
                !jr::Vec3(n, "position", w, pos, error) ||
                !jr::Vec3(n, "rotation", w, rot, error) || !jr::Vec3(n, "scale", w, scale, error) ||
                !jr::Int(n, "render_id", w, renderID, error) ||
                !jr::Int(n, "gbuffer_id", w, gbufID, error) ||
                !jr::String(n, "user_properties", w, props, error) ||
                !jr::Bool(n, "renderable", w, renderable, error) ||
                !ReadWireColour(n, w, wire, error))
                return false;
            if (name.empty()) return Bad(w + ".name: every node needs a name", error);
            if (scale.x == 0 || scale.y == 0 || scale.z == 0)
                return Bad(w + ".scale: no component may be 0", error);
            auto git = n.find("geometry");
            if (git == n.end()) return Bad(w + ": a node needs a geometry", error);
            std::shared_ptr<Object> obj;
            if (!ReadGeometry(*git, w + ".geometry", obj, error)) return false;
            if (!ReadChannels(n, w, *obj, error)) return false;
            Material* mtl = nullptr;
            if (!mtlName.empty() && !(mtl = scene_->FindMaterial(mtlName)))
                return Bad(w + ".material: no material named '" + mtlName + "'", error);
            INode* node = scene_->CreateNode(FromUTF8(name));
            if (renderID >= 0) node->SetRenderID(renderID);
            node->SetGBufID(gbufID);
            node->SetWireColor(wire);
            node->SetUserPropBuffer(FromUTF8(props));
            node->SetRenderable(renderable);
            node->SetObjectTM(ScaleMatrix(scale) * RotateXYZMatrix(rot) * TransMatrix(pos));
            node->SetObjectRef(obj);
            node->SetMtl(mtl);
        }
        return true;
    }

    bool ReadChannels(const json& n, const std::string& w, Object& obj, std::string& error) {
        auto it = n.find("channels");
        if (it == n.end()) return true;
        if (!it->is_object()) return Bad(w + ".channels: expected an object", error);
        for (auto c = it->begin(); c != it->end(); ++c) {
            const std::string cw = w + ".channels." + c.key();
            char* end = nullptr;
            const long chan = std::strtol(c.key().c_str(), &end, 10);
            if (c.key().empty() || *end != 0 || chan < 0 || chan > 99)
                return Bad(cw + ": channels are numbered 0 to 99", error);
            if (!c->is_object()) return Bad(cw + ": expected an object", error);
            ChannelMapping m;
            if (!jr::OnlyKeys(*c, {"scale", "offset"}, cw, error) ||
                !jr::Vec3(*c, "scale", cw, m.scale, error) ||
                !jr::Vec3(*c, "offset", cw, m.offset, error))
                return false;
            obj.SetChannel(int(chan), m);
        }
        return true;
    }

    std::filesystem::path baseDir_;
    std::unique_ptr<Scene> scene_;
    ColourSettings colour_;
};

} // namespace

std::unique_ptr<Scene> LoadSceneText(const std::string& text, const std::filesystem::path& baseDir,
                                     std::string& error) {
    json root;
    try {
        root = json::parse(text);
    } catch (const json::parse_error& e) {
        // The library's text names the byte and what it expected.
        error = std::string("not valid JSON: ") + e.what();
        return nullptr;
    }
    Loader loader(baseDir);
    return loader.Load(root, error);
}

std::unique_ptr<Scene> LoadSceneFile(const std::filesystem::path& path, std::string& error) {
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        error = path.string() + ": cannot open the file";
        return nullptr;
    }
    std::stringstream text;
    text << in.rdbuf();
    auto scene = LoadSceneText(text.str(), path.parent_path(), error);
    if (!scene) error = path.string() + ": " + error;
    return scene;
}

} // namespace TrelmSDK
