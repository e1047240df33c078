// The shading system: loads compiled shaders, builds shader groups from layers, parameters and
// connections, and executes a group per shading sample on per-thread contexts.
#pragma once

#include <OSL/oslclosure.h>
#include <OSL/oslconfig.h>
#include <OSL/rendererservices.h>
#include <OSL/shaderglobals.h>

#include <memory>

namespace OSL {

class ShadingSystemImpl;
class ShaderGroup;
class ShadingContext;
struct PerThreadInfo;
// A symbol of a group's layer as find_symbol returns it; opaque to callers.
class ShaderSymbol;

typedef std::shared_ptr<ShaderGroup> ShaderGroupRef;

// Shader uses, as the "usage" argument of Shader and ShaderGroupBegin names them.
enum class ShaderUse : int { Surface = 0, Displacement = 1, Last };

class ShadingSystem {
public:
    ShadingSystem(RendererServices* renderer = nullptr, TextureSystem* texturesystem = nullptr,
                  ErrorHandler* err = nullptr);
    ~ShadingSystem();
    ShadingSystem(const ShadingSystem&) = delete;
    ShadingSystem& operator=(const ShadingSystem&) = delete;

    // System attributes. Unknown names or mismatched types return false and change nothing.
    bool attribute(string_view name, TypeDesc type, const void* val);
    bool attribute(string_view name, int val) { return attribute(name, TypeInt, &val); }
    bool attribute(string_view name, float val) { return attribute(name, TypeFloat, &val); }
    bool attribute(string_view name, double val) {
        float f = float(val);
        return attribute(name, TypeFloat, &f);
    }
    bool attribute(string_view name, string_view val) {
        ustring s(val);
        return attribute(name, TypeString, &s);
    }
    bool getattribute(string_view name, TypeDesc type, void* val);
    bool getattribute(string_view name, int& val) { return getattribute(name, TypeInt, &val); }
    bool getattribute(string_view name, float& val) { return getattribute(name, TypeFloat, &val); }
    bool getattribute(string_view name, ustring& val) {
        return getattribute(name, TypeString, &val);
    }

    // Group attributes.
    bool attribute(ShaderGroup* group, string_view name, TypeDesc type, const void* val);
    bool attribute(ShaderGroup* group, string_view name, int val) {
        return attribute(group, name, TypeInt, &val);
    }
    bool attribute(ShaderGroup* group, string_view name, string_view val) {
        ustring s(val);
        return attribute(group, name, TypeString, &s);
    }
    bool getattribute(ShaderGroup* group, string_view name, TypeDesc type, void* val);

    // Loads OSO text under the given shader name (replacing an earlier one of that name).
    bool LoadMemoryCompiledShader(string_view shadername, string_view buffer);

    ShaderGroupRef ShaderGroupBegin(string_view groupname = string_view());
    ShaderGroupRef ShaderGroupBegin(string_view groupname, string_view usage,
                                    string_view groupspec = string_view());
    bool ShaderGroupEnd();
    bool ShaderGroupEnd(ShaderGroup& group);

    // Sets a parameter value for the next Shader call of the group.
    bool Parameter(string_view name, TypeDesc t, const void* val, bool lockgeom = true);
    bool Parameter(ShaderGroup& group, string_view name, TypeDesc t, const void* val,
                   bool lockgeom = true);

    // Adds a layer running the named shader (loaded, or found as NAME.oso on the search path).
    bool Shader(string_view shaderusage, string_view shadername = string_view(),
                string_view layername = string_view());
    bool Shader(ShaderGroup& group, string_view shaderusage, string_view shadername,
                string_view layername);

    bool ConnectShaders(string_view srclayer, string_view srcparam, string_view dstlayer,
                        string_view dstparam);
    bool ConnectShaders(ShaderGroup& group, string_view srclayer, string_view srcparam,
                        string_view dstlayer, string_view dstparam);

    void register_closure(string_view name, int id, const ClosureParam* params,
                          PrepareClosureFunc prepare, SetupClosureFunc setup);
    bool query_closure(const char** name, int* id, const ClosureParam** params);

    PerThreadInfo* create_thread_info();
    void destroy_thread_info(PerThreadInfo* threadinfo);
    ShadingContext* get_context(PerThreadInfo* threadinfo = nullptr,
                                TextureSystem::Perthread* texture_threadinfo = nullptr);
    void release_context(ShadingContext* ctx);

    bool execute(ShadingContext& ctx, ShaderGroup& group, int shadeindex, ShaderGlobals& globals,
                 void* userdata_base_ptr = nullptr, void* output_base_ptr = nullptr,
                 bool run = true);
    bool execute(ShadingContext& ctx, ShaderGroup& group, ShaderGlobals& globals, bool run = true) {
        return execute(ctx, group, 0, globals, nullptr, nullptr, run);
    }
    bool execute(ShadingContext* ctx, ShaderGroup& group, ShaderGlobals& globals, bool run = true);

    // execute() in steps: prepare the context for the group (running nothing unless asked),
    // run chosen layers (each at most once, pulling its upstream layers), then finish (Ci,
    // buffered shader output).
    bool execute_init(ShadingContext& ctx, ShaderGroup& group, int shadeindex,
                      ShaderGlobals& globals, void* userdata_base_ptr, void* output_base_ptr,
                      bool run = true);
    bool execute_layer(ShadingContext& ctx, int shadeindex, ShaderGlobals& globals,
                       void* userdata_base_ptr, void* output_base_ptr, int layernumber);
    bool execute_cleanup(ShadingContext& ctx);
    // Index of the named layer in the group, or -1.
    int find_layer(const ShaderGroup& group, ustring layername) const;
    // Changes a parameter of a built group's layer between executions; only parameters that
    // were not folded as constants (lockgeom=0 or interactive) can change.
    bool ReParameter(ShaderGroup& group, string_view layername, string_view paramname,
                     TypeDesc type, const void* val);

    const ShaderSymbol* find_symbol(const ShaderGroup& group, ustring layername,
                                    ustring symbolname) const;
    // Searches the layers from the last to the first; "layer.sym" names a layer explicitly.
    const ShaderSymbol* find_symbol(const ShaderGroup& group, ustring symbolname) const;
    TypeDesc symbol_typedesc(const ShaderSymbol* sym) const;
    // The value of the symbol in the context after its latest execute, or null when the symbol
    // has no storage there (the context has not run that group).
    const void* symbol_address(const ShadingContext& ctx, const ShaderSymbol* sym) const;
    const void* get_symbol(ShadingContext& ctx, ustring layername, ustring symbolname,
                           TypeDesc& type) const;

    int raytype_bit(ustring name);

    TextureSystem* texturesys() const;
    RendererServices* renderer() const;

    ShadingSystemImpl& impl() { return *m_impl; }

private:
    std::unique_ptr<ShadingSystemImpl> m_impl;
};

} // namespace OSL
