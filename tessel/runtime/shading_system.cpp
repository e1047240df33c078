// Creation and configuration of the process's shading system, its closures and built-in shaders.
#include "runtime/shading_system.h"

#include "compile/compiled_shader_registry.h"
#include "compile/oslc_error_handler.h"
#include "runtime/builtin_shaders.h"
#include "runtime/trelm_render_services.h"

#include <OSL/oslclosure.h>
#include <trelm/config/config_manager.h>

#include <atomic>
#include <cstdlib>

namespace {

// Written once during creation on the main thread; read by the texture file watcher.
std::atomic<bool> gAutoFileUpdate{true};
int gRegisteredClosures = 0; // main thread only

// Parameter records of the closures shaders may build.
struct EmptyParams {};
struct NormalLabelParams {
    OSL::Vec3 N;
    OSL::ustring label;
};
struct NormalFloatParams {
    OSL::Vec3 N;
    float value;
};
struct PhongParams {
    OSL::Vec3 N;
    float exponent;
    OSL::ustring label;
};
struct WardParams {
    OSL::Vec3 N, T;
    float ax, ay;
};
struct MicrofacetParams {
    OSL::ustring distribution;
    OSL::Vec3 N, U;
    float xalpha, yalpha, eta;
    int refract;
};
struct DebugParams {
    OSL::ustring tag;
};

void RegisterClosures(OSL::ShadingSystem& ss) {
    struct Entry {
        const char* name;
        int id;
        OSL::ClosureParam params[8];
    };
    static const Entry table[] = {
        {"emission", 1, {CLOSURE_FINISH_PARAM(EmptyParams)}},
        {"background", 2, {CLOSURE_FINISH_PARAM(EmptyParams)}},
        {"diffuse",
         3,
         {CLOSURE_VECTOR_PARAM(NormalLabelParams, N),
          CLOSURE_STRING_KEYPARAM(NormalLabelParams, label, "label"),
          CLOSURE_FINISH_PARAM(NormalLabelParams)}},
        {"oren_nayar",
         4,
         {CLOSURE_VECTOR_PARAM(NormalFloatParams, N), CLOSURE_FLOAT_PARAM(NormalFloatParams, value),
          CLOSURE_FINISH_PARAM(NormalFloatParams)}},
        {"translucent",
         5,
         {CLOSURE_VECTOR_PARAM(NormalLabelParams, N), CLOSURE_FINISH_PARAM(NormalLabelParams)}},
        {"phong",
         6,
         {CLOSURE_VECTOR_PARAM(PhongParams, N), CLOSURE_FLOAT_PARAM(PhongParams, exponent),
          CLOSURE_STRING_KEYPARAM(PhongParams, label, "label"), CLOSURE_FINISH_PARAM(PhongParams)}},
        {"ward",
         7,
         {CLOSURE_VECTOR_PARAM(WardParams, N), CLOSURE_VECTOR_PARAM(WardParams, T),
          CLOSURE_FLOAT_PARAM(WardParams, ax), CLOSURE_FLOAT_PARAM(WardParams, ay),
          CLOSURE_FINISH_PARAM(WardParams)}},
        {"microfacet",
         8,
         {CLOSURE_STRING_PARAM(MicrofacetParams, distribution),
          CLOSURE_VECTOR_PARAM(MicrofacetParams, N), CLOSURE_VECTOR_PARAM(MicrofacetParams, U),
          CLOSURE_FLOAT_PARAM(MicrofacetParams, xalpha),
          CLOSURE_FLOAT_PARAM(MicrofacetParams, yalpha), CLOSURE_FLOAT_PARAM(MicrofacetParams, eta),
          CLOSURE_INT_PARAM(MicrofacetParams, refract), CLOSURE_FINISH_PARAM(MicrofacetParams)}},
        {"reflection",
         9,
         {CLOSURE_VECTOR_PARAM(NormalFloatParams, N), CLOSURE_FINISH_PARAM(NormalFloatParams)}},
        {"reflection",
         10,
         {CLOSURE_VECTOR_PARAM(NormalFloatParams, N), CLOSURE_FLOAT_PARAM(NormalFloatParams, value),
          CLOSURE_FINISH_PARAM(NormalFloatParams)}},
        {"refraction",
         11,
         {CLOSURE_VECTOR_PARAM(NormalFloatParams, N), CLOSURE_FLOAT_PARAM(NormalFloatParams, value),
          CLOSURE_FINISH_PARAM(NormalFloatParams)}},
        {"transparent", 12, {CLOSURE_FINISH_PARAM(EmptyParams)}},
        {"debug", 13, {CLOSURE_STRING_PARAM(DebugParams, tag), CLOSURE_FINISH_PARAM(DebugParams)}},
        {"holdout", 14, {CLOSURE_FINISH_PARAM(EmptyParams)}},
    };
    for (const Entry& e : table) {
        ss.register_closure(e.name, e.id, e.params, nullptr, nullptr);
        ++gRegisteredClosures;
    }
}

// Compiles a built-in shader through the registry and loads it once more under its own name.
void LoadBuiltinShader(CompiledShaderRegistry& registry, OSL::ShadingSystem& ss, const char* name,
                       const char* source) {
    const SourceKey key = CompiledShaderRegistry::SourceKeyOf(source);
    std::wstring fileName(name, name + std::char_traits<char>::length(name));
    if (!registry.Compile(source, nullptr, fileName)) return;
    if (!ss.LoadMemoryCompiledShader(name, registry.CompiledText(key)))
        SharedOSLCErrorHandler()(OIIO::ErrorHandler::EH_ERROR,
                                 "Could not load compiled buffer from \"" +
                                     registry.RecordedShaderName(key) + "\"\n");
}

} // namespace

int OptimizeLevelFromEnvironment() {
    const char* value = std::getenv("TRELM_OSL_OPT");
    return value ? std::atoi(value) : 2;
}

bool ApplyTextureConfiguration(TrelmSDK::ConfigManager& config, OIIO::TextureSystem* ts) {
    TrelmSDK::ConfigSection section = config.Section("OpenImageIO");
    struct IntKey {
        const char* key;
        int def;
    };
    static const IntKey intKeys[] = {
        {"max_open_files", 100}, {"autotile", 0}, {"automip", 1}, {"autoscanline", 0}};
    for (const IntKey& k : intKeys)
        if (!section.HasKey(k.key)) section.SetInt(k.key, k.def);
    if (!section.HasKey("max_memory_MB")) section.SetFloat("max_memory_MB", 16384.0f);
    if (!section.HasKey("autoFileUpdate")) section.SetInt("autoFileUpdate", 1);

    if (auto v = section.GetInt("max_open_files"); v && ts) ts->attribute("max_open_files", *v);
    if (auto v = section.GetFloat("max_memory_MB"); v && ts) ts->attribute("max_memory_MB", *v);
    for (const char* key : {"autotile", "automip", "autoscanline"})
        if (auto v = section.GetInt(key); v && ts) ts->attribute(key, *v);
    bool autoFileUpdate = gAutoFileUpdate.load();
    if (auto v = section.GetInt("autoFileUpdate")) autoFileUpdate = *v != 0;
    return autoFileUpdate;
}

bool AutoFileUpdate() {
    return gAutoFileUpdate.load(std::memory_order_relaxed);
}

int RegisteredClosureCount() {
    return gRegisteredClosures;
}

OSL::ShadingSystem* GetShadingSystem(CompiledShaderRegistry& registry) {
    if (registry.shadingSystem) return registry.shadingSystem;

    TrelmRenderServices& services = TrelmRenderServices::Instance();
    registry.shadingSystemOwner =
        std::make_shared<OSL::ShadingSystem>(&services, nullptr, &SharedOSLCErrorHandler());
    registry.shadingSystem = registry.shadingSystemOwner.get();
    OSL::ShadingSystem& ss = *registry.shadingSystem;

    RegisterClosures(ss);
    ss.attribute("debug", 0);
    ss.attribute("compile_report", 1);
    ss.attribute("optimize", OptimizeLevelFromEnvironment());
    ss.attribute("lockgeom", 1);
    ss.attribute("debug_nan", 0);
    ss.attribute("debug_uninit", 0);

    OIIO::TextureSystem* ts = ss.texturesys();
    if (ts) ts->attribute("gray_to_rgb", 1);
    gAutoFileUpdate = ApplyTextureConfiguration(TrelmSDK::GetConfigManager(), ts);

    LoadBuiltinShader(registry, ss, kTrelmTexmapName, kTrelmTexmapSource);
    LoadBuiltinShader(registry, ss, kTrelmRootName, kTrelmRootSource);
    return registry.shadingSystem;
}

void HandleRuntimeNotification(CompiledShaderRegistry& registry, int code, void* callParam) {
    (void)callParam; // the node list of 132 goes to the node property manager, not built yet
    switch (code) {
    case 57:
        TrelmRenderServices::Instance().RefreshSceneData();
        break;
    case 238:
        if (registry.shadingSystem && registry.shadingSystem->texturesys())
            registry.shadingSystem->texturesys()->close_all();
        break;
    default:
        break;
    }
}
