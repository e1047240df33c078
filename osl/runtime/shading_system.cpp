// ShadingSystem: the public face of the shading system, forwarding to ShadingSystemImpl, plus
// system and group attributes, closures, contexts and symbol queries.
#include "group_builder.h"
#include "shading_system_impl.h"

#include <OSL/oslexec.h>

#include <OpenImageIO/texture.h>

#include <atomic>
#include <cctype>
#include <set>

namespace OSL {

namespace {

std::atomic<int> g_unnamedGroups{0};

// Routes messages to the standard streams when no handler is given.
ErrorHandler& defaultHandler() {
    return ErrorHandler::default_handler();
}

} // namespace

ShaderGroup::ShaderGroup() = default;
ShaderGroup::~ShaderGroup() = default;

int ShaderGroup::findLayer(ustring layername) const {
    for (size_t l = layers.size(); l-- > 0;)
        if (layers[l].layername == layername) return int(l);
    return -1;
}

ShadingSystemImpl::ShadingSystemImpl(RendererServices* r, TextureSystem* ts, ErrorHandler* e)
    : renderer(r), texsys(ts), err(e ? e : &defaultHandler()) {
    if (!texsys) {
        texsys = TextureSystem::create(true);
        // Plain scanline images are mipmapped and tiled on first use, as OSL's own default does.
        texsys->attribute("automip", 1);
        texsys->attribute("autotile", 64);
        ownsTexsys = true;
    }
    if (!renderer) {
        ownRenderer = std::make_unique<RendererServices>(texsys);
        renderer = ownRenderer.get();
    }
    if (!renderer->m_texturesys) renderer->m_texturesys = texsys;
    for (const char* t : {"camera", "shadow", "reflection", "refraction", "diffuse", "glossy",
                          "subsurface", "displacement"})
        raytypes.emplace_back(t);
}

ShadingSystemImpl::~ShadingSystemImpl() {
    if (ownsTexsys && texsys) TextureSystem::destroy(texsys);
}

const ClosureEntry* ShadingSystemImpl::findClosure(ustring name) const {
    // A later registration of a name replaces the earlier one.
    for (size_t k = closures.size(); k-- > 0;)
        if (closures[k].name == name) return &closures[k];
    return nullptr;
}

void ShadingSystemImpl::error(const std::string& msg) const {
    (*err)(ErrorHandler::EH_ERROR, msg);
}
void ShadingSystemImpl::warning(const std::string& msg) const {
    (*err)(ErrorHandler::EH_WARNING, msg);
}
void ShadingSystemImpl::info(const std::string& msg) const {
    (*err)(ErrorHandler::EH_INFO, msg);
}
void ShadingSystemImpl::message(const std::string& msg) const {
    (*err)(ErrorHandler::EH_MESSAGE, msg);
}

ShadingSystem::ShadingSystem(RendererServices* renderer, TextureSystem* texturesystem,
                             ErrorHandler* err)
    : m_impl(std::make_unique<ShadingSystemImpl>(renderer, texturesystem, err)) {}

ShadingSystem::~ShadingSystem() = default;

bool ShadingSystem::attribute(string_view name, TypeDesc type, const void* val) {
    ShadingSystemImpl& s = *m_impl;
    if (type == TypeInt) {
        const int v = *static_cast<const int*>(val);
        static const std::pair<const char*, int ShadingSystemImpl::*> ints[] = {
            {"debug", &ShadingSystemImpl::debug},
            {"compile_report", &ShadingSystemImpl::compileReport},
            {"optimize", &ShadingSystemImpl::optimize},
            {"lockgeom", &ShadingSystemImpl::lockgeom},
            {"debug_nan", &ShadingSystemImpl::debugNan},
            {"debug_uninit", &ShadingSystemImpl::debugUninit},
            {"error_repeats", &ShadingSystemImpl::errorRepeats},
            {"lazylayers", &ShadingSystemImpl::lazyLayers},
            {"countlayerexecs", &ShadingSystemImpl::countLayerExecs},
            {"greedyjit", &ShadingSystemImpl::greedyJit},
            {"lazyglobals", &ShadingSystemImpl::lazyGlobals},
            {"llvm_debug_layers", &ShadingSystemImpl::debugLayers},
            {"opt_constant_fold", &ShadingSystemImpl::optConstantFold},
            {"opt_elide_useless_ops", &ShadingSystemImpl::optElideUselessOps},
            {"opt_merge_instances", &ShadingSystemImpl::optMergeInstances},
            {"opt_merge_instances_with_userdata",
             &ShadingSystemImpl::optMergeInstancesWithUserdata},
            {"opt_warnings", &ShadingSystemImpl::optWarnings},
            {"opt_coalesce_temps", &ShadingSystemImpl::optCoalesceTemps}};
        for (const auto& e : ints)
            if (name == e.first) {
                s.*(e.second) = v;
                return true;
            }
        // Options of the reference's JIT and optimiser that have no meaning for this executor.
        static const char* accepted[] = {"lazyunconnected",
                                         "lazy_userdata",
                                         "userdata_isconnected",
                                         "llvm_optimize",
                                         "llvm_debug",
                                         "opt_peephole",
                                         "opt_elide_unconnected_outputs",
                                         "range_checking",
                                         "unknown_coordsys_error",
                                         "connection_error",
                                         "strict_messages",
                                         "statistics:level",
                                         "profile",
                                         "max_warnings_per_thread",
                                         "exec_repeat",
                                         "buffer_printf",
                                         "no_noise",
                                         "no_pointcloud",
                                         "force_derivs",
                                         "allow_shader_replacement"};
        for (const char* a : accepted)
            if (name == a) return true;
        return false;
    }
    if (type == TypeString) {
        const std::string v = static_cast<const ustring*>(val)->string();
        if (name == "searchpath:shader") return s.searchpathShader = v, true;
        if (name == "commonspace") return s.commonspace = v, true;
        if (name == "colorspace") return s.colorspace = v, true;
        if (name == "archive_groupname" || name == "archive_filename") return true;
        return false;
    }
    if (type.basetype == TypeDesc::STRING && type.arraylen > 0 && name == "raytypes") {
        s.raytypes.assign(static_cast<const ustring*>(val),
                          static_cast<const ustring*>(val) + type.arraylen);
        return true;
    }
    if (type == TypeFloat && name == "debug_nan") return s.debugNan = int(*(const float*)val), true;
    return false;
}

bool ShadingSystem::getattribute(string_view name, TypeDesc type, void* val) {
    ShadingSystemImpl& s = *m_impl;
    if (type == TypeInt) {
        int* out = static_cast<int*>(val);
        if (name == "debug") return *out = s.debug, true;
        if (name == "compile_report") return *out = s.compileReport, true;
        if (name == "optimize") return *out = s.optimize, true;
        if (name == "lockgeom") return *out = s.lockgeom, true;
        if (name == "debug_nan") return *out = s.debugNan, true;
        if (name == "debug_uninit") return *out = s.debugUninit, true;
        if (name == "error_repeats") return *out = s.errorRepeats, true;
        if (name == "lazylayers") return *out = s.lazyLayers, true;
        if (name == "opt_constant_fold") return *out = s.optConstantFold, true;
        if (name == "opt_elide_useless_ops") return *out = s.optElideUselessOps, true;
        if (name == "opt_merge_instances") return *out = s.optMergeInstances, true;
        if (name == "opt_merge_instances_with_userdata")
            return *out = s.optMergeInstancesWithUserdata, true;
        if (name == "opt_warnings") return *out = s.optWarnings, true;
        if (name == "opt_coalesce_temps") return *out = s.optCoalesceTemps, true;
        if (name == "num_closures") return *out = int(s.closures.size()), true;
        return false;
    }
    if (type == TypeString) {
        ustring* out = static_cast<ustring*>(val);
        if (name == "searchpath:shader") return *out = ustring(s.searchpathShader), true;
        if (name == "commonspace") return *out = ustring(s.commonspace), true;
        if (name == "colorspace") return *out = ustring(s.colorspace), true;
        return false;
    }
    return false;
}

namespace {

// Names as an array of the requested length, or (type PTR) as a pointer to the group's own
// array, which stays valid as long as the group.
bool putStrings(const std::vector<ustring>& v, TypeDesc type, void* val) {
    if (type.basetype == TypeDesc::PTR) {
        *static_cast<const ustring**>(val) = v.empty() ? nullptr : v.data();
        return true;
    }
    if (type.basetype != TypeDesc::STRING) return false;
    if (type.arraylen == 0 && type.aggregate == TypeDesc::SCALAR && v.size() != 1) return false;
    const size_t n = std::min<size_t>(v.size(), size_t(std::max(1, type.arraylen)));
    for (size_t k = 0; k < n; ++k) static_cast<ustring*>(val)[k] = v[k];
    return true;
}

} // namespace

bool ShadingSystem::attribute(ShaderGroup* group, string_view name, TypeDesc type,
                              const void* val) {
    if (!group) return attribute(name, type, val);
    ShadingSystemImpl& s = *m_impl;
    if (type.basetype == TypeDesc::STRING &&
        (name == "renderer_outputs" || name == "entry_layers")) {
        const int n = std::max(1, type.arraylen);
        std::vector<ustring> v(static_cast<const ustring*>(val),
                               static_cast<const ustring*>(val) + n);
        if (name == "renderer_outputs")
            group->rendererOutputs = v;
        else
            group->entryLayers = v;
        if (group->ended) return endGroup(s, *group);
        return true;
    }
    if (type == TypeString && name == "groupname") {
        group->name = *static_cast<const ustring*>(val);
        return true;
    }
    return false;
}

bool ShadingSystem::getattribute(ShaderGroup* group, string_view name, TypeDesc type, void* val) {
    if (!group) return getattribute(name, type, val);
    const ShaderGroup& g = *group;
    if (name == "num_layers" && type == TypeInt) return *(int*)val = int(g.layers.size()), true;
    if (name == "groupname" && type == TypeString) return *(ustring*)val = g.name, true;
    if (type == TypeInt && g.program &&
        (name == "stat:ops_folded" || name == "stat:ops_removed" || name == "stat:layers_merged" ||
         name == "stat:instructions")) {
        const Program& p = *g.program;
        *(int*)val = name == "stat:ops_folded"      ? p.optFolded
                     : name == "stat:ops_removed"   ? p.optRemoved
                     : name == "stat:layers_merged" ? p.optMergedLayers
                                                    : int(p.instrs.size());
        return true;
    }
    if (name == "pickle" && type == TypeString)
        return *(ustring*)val = ustring(serializeGroup(g)), true;
    if (name == "layer_names" && type.basetype == TypeDesc::STRING) {
        std::vector<ustring> names;
        for (const ShaderInstance& i : g.layers) names.push_back(i.layername);
        return putStrings(names, type, val);
    }
    if (name == "num_renderer_outputs" && type == TypeInt)
        return *(int*)val = int(g.rendererOutputs.size()), true;
    if (name == "renderer_outputs" && type.basetype == TypeDesc::STRING)
        return putStrings(g.rendererOutputs, type, val);
    const ShaderGroup::Needs& needs = g.needs;
    if (name == "num_globals_needed" && type == TypeInt)
        return *(int*)val = int(needs.globals.size()), true;
    if (name == "globals_needed") return putStrings(needs.globals, type, val);
    if (name == "num_attributes_needed" && type == TypeInt)
        return *(int*)val = int(needs.attributes.size()), true;
    if (name == "attributes_needed") return putStrings(needs.attributes, type, val);
    if (name == "attribute_scopes") return putStrings(needs.scopes, type, val);
    if (name == "unknown_attributes_needed" && type == TypeInt)
        return *(int*)val = needs.unknownAttributes, true;
    if (name == "num_textures_needed" && type == TypeInt)
        return *(int*)val = int(needs.textures.size()), true;
    if (name == "textures_needed") return putStrings(needs.textures, type, val);
    if (name == "unknown_textures_needed" && type == TypeInt)
        return *(int*)val = needs.unknownTextures, true;
    if (name == "num_closures_needed" && type == TypeInt)
        return *(int*)val = int(needs.closures.size()), true;
    if (name == "closures_needed") return putStrings(needs.closures, type, val);
    if (name == "unknown_closures_needed" && type == TypeInt)
        return *(int*)val = needs.unknownClosures, true;
    return false;
}

bool ShadingSystem::LoadMemoryCompiledShader(string_view shadername, string_view buffer) {
    ShadingSystemImpl& s = *m_impl;
    if (shadername.empty()) {
        s.error("Attempt to load shader with empty name \"\".");
        return false;
    }
    if (buffer.empty()) {
        s.error("Attempt to load shader \"" + std::string(shadername) + "\" with empty OSO data.");
        return false;
    }
    std::string err;
    ShaderMasterRef m = loadShaderMaster(shadername, std::string(buffer), err);
    if (!m) {
        s.error("Unable to parse preloaded shader \"" + std::string(shadername) + "\": " + err);
        return false;
    }
    std::lock_guard<std::mutex> lock(s.mastersMutex);
    s.masters[ustring(shadername)] = m;
    return true;
}

ShaderGroupRef ShadingSystem::ShaderGroupBegin(string_view groupname) {
    auto g = std::make_shared<ShaderGroup>();
    g->name = groupname.empty() ? ustring("unnamed_group_" + std::to_string(++g_unnamedGroups))
                                : ustring(groupname);
    m_impl->current = g;
    return g;
}

ShaderGroupRef ShadingSystem::ShaderGroupBegin(string_view groupname, string_view,
                                               string_view groupspec) {
    ShaderGroupRef g = ShaderGroupBegin(groupname);
    if (groupspec.empty()) return g;
    // The serialised form: "param TYPE NAME VALUES... ;", "shader NAME LAYER ;",
    // "connect A.x B.y ;".
    // Statements end at ';'; a failing one is shown with the rest of the text after it.
    std::vector<std::pair<size_t, std::string>> stmts;
    for (size_t at = 0; at < groupspec.size();) {
        size_t end = groupspec.find(';', at);
        if (end == string_view::npos) end = groupspec.size();
        size_t first = at;
        while (first < end && std::isspace(static_cast<unsigned char>(groupspec[first]))) ++first;
        stmts.emplace_back(first, std::string(groupspec.substr(at, end - at)));
        at = end + 1;
    }
    bool ok = true;
    for (auto& [stmtBegin, rawStmt] : stmts) {
        const std::string stmt(OIIO::Strutil::strip(rawStmt));
        if (stmt.empty()) continue;
        const bool okBefore = ok;
        ok = true;
        std::vector<std::string> tok;
        {
            std::string cur;
            bool quoted = false;
            for (size_t k = 0; k < stmt.size(); ++k) {
                const char c = stmt[k];
                if (c == '"') {
                    quoted = !quoted;
                    cur += c;
                } else if (!quoted && (c == ' ' || c == '\t' || c == '\n' || c == ',')) {
                    if (!cur.empty()) tok.push_back(cur), cur.clear();
                } else {
                    cur += c;
                }
            }
            if (!cur.empty()) tok.push_back(cur);
        }
        if (tok.empty()) continue;
        if (tok[0] == "shader" && tok.size() >= 2) {
            ok &= Shader(*g, "surface", tok[1], tok.size() >= 3 ? tok[2] : tok[1]);
        } else if (tok[0] == "connect" && tok.size() >= 3) {
            const size_t a = tok[1].find('.'), b = tok[2].find('.');
            ok = a != std::string::npos && b != std::string::npos &&
                 ConnectShaders(*g, tok[1].substr(0, a), tok[1].substr(a + 1), tok[2].substr(0, b),
                                tok[2].substr(b + 1));
        } else if (tok[0] == "param" && tok.size() >= 3) {
            TypeDesc t(tok[1].c_str());
            const std::string pname = tok[2];
            bool lockgeom = true;
            std::vector<std::string> values;
            for (size_t k = 3; k < tok.size(); ++k) {
                if (tok[k].rfind("[[", 0) == 0) {
                    if (tok[k].find("lockgeom=0") != std::string::npos ||
                        (k + 1 < tok.size() && tok[k + 1].find("lockgeom=0") != std::string::npos))
                        lockgeom = false;
                    break;
                }
                values.push_back(tok[k]);
            }
            ok = t.basetype != TypeDesc::UNKNOWN;
            const size_t count = t.numelements() * t.aggregate;
            if (!ok) {
            } else if (t.basetype == TypeDesc::STRING) {
                std::vector<ustring> v(count);
                for (size_t k = 0; k < count && k < values.size(); ++k) {
                    std::string sv = values[k];
                    if (sv.size() >= 2 && sv.front() == '"') sv = sv.substr(1, sv.size() - 2);
                    v[k] = ustring(OIIO::Strutil::unescape_chars(sv));
                }
                Parameter(*g, pname, t, v.data(), lockgeom);
            } else if (t.basetype == TypeDesc::INT) {
                std::vector<int> v(count);
                for (size_t k = 0; k < count && k < values.size(); ++k)
                    v[k] = OIIO::Strutil::stoi(values[k]);
                Parameter(*g, pname, t, v.data(), lockgeom);
            } else {
                std::vector<float> v(count);
                for (size_t k = 0; k < count && k < values.size(); ++k)
                    v[k] = OIIO::Strutil::stof(values[k]);
                Parameter(*g, pname, t, v.data(), lockgeom);
            }
        } else {
            ok = false;
        }
        if (!ok) {
            m_impl->error("ShaderGroupBegin: error parsing group description: \n        group: " +
                          g->name.string() + "\n        problem might be here: " +
                          std::string(groupspec.substr(stmtBegin)));
            m_impl->current.reset();
            return nullptr;
        }
        ok = okBefore;
    }
    return g;
}

bool ShadingSystem::ShaderGroupEnd() {
    if (!m_impl->current) {
        m_impl->error("ShaderGroupEnd() was called without ShaderGroupBegin()");
        return false;
    }
    ShaderGroupRef g = m_impl->current;
    m_impl->current.reset();
    return ShaderGroupEnd(*g);
}

bool ShadingSystem::ShaderGroupEnd(ShaderGroup& group) {
    return endGroup(*m_impl, group);
}

bool ShadingSystem::Parameter(string_view name, TypeDesc t, const void* val, bool lockgeom) {
    if (!m_impl->current) {
        m_impl->error("Parameter() called before ShaderGroupBegin()");
        return false;
    }
    return Parameter(*m_impl->current, name, t, val, lockgeom);
}

bool ShadingSystem::Parameter(ShaderGroup& group, string_view name, TypeDesc t, const void* val,
                              bool lockgeom) {
    return addParameter(*m_impl, group, name, t, val, lockgeom);
}

bool ShadingSystem::Shader(string_view usage, string_view shadername, string_view layername) {
    if (!m_impl->current) {
        m_impl->error("Shader() called before ShaderGroupBegin()");
        return false;
    }
    return Shader(*m_impl->current, usage, shadername, layername);
}

bool ShadingSystem::Shader(ShaderGroup& group, string_view usage, string_view shadername,
                           string_view layername) {
    return addShader(*m_impl, group, usage, shadername, layername);
}

bool ShadingSystem::ConnectShaders(string_view srclayer, string_view srcparam, string_view dstlayer,
                                   string_view dstparam) {
    if (!m_impl->current) {
        m_impl->error("ConnectShaders() called before ShaderGroupBegin()");
        return false;
    }
    return ConnectShaders(*m_impl->current, srclayer, srcparam, dstlayer, dstparam);
}

bool ShadingSystem::ConnectShaders(ShaderGroup& group, string_view srclayer, string_view srcparam,
                                   string_view dstlayer, string_view dstparam) {
    return connectShaders(*m_impl, group, srclayer, srcparam, dstlayer, dstparam);
}

void ShadingSystem::register_closure(string_view name, int id, const ClosureParam* params,
                                     PrepareClosureFunc, SetupClosureFunc) {
    ClosureEntry e;
    e.name = ustring(name);
    e.id = id;
    if (params) {
        for (const ClosureParam* p = params;; ++p) {
            if (p->type == TypeDesc()) {
                e.structSize = p->offset;
                e.structAlign = std::max(1, p->field_size);
                break;
            }
            e.params.push_back(*p);
        }
    }
    m_impl->closures.push_back(std::move(e));
}

bool ShadingSystem::query_closure(const char** name, int* id, const ClosureParam** params) {
    for (const ClosureEntry& e : m_impl->closures) {
        if ((name && *name && e.name == *name) || (id && !(name && *name) && e.id == *id)) {
            if (name) *name = e.name.c_str();
            if (id) *id = e.id;
            if (params) *params = e.params.data();
            return true;
        }
    }
    return false;
}

PerThreadInfo* ShadingSystem::create_thread_info() {
    return new PerThreadInfo;
}

void ShadingSystem::destroy_thread_info(PerThreadInfo* threadinfo) {
    delete threadinfo;
}

ShadingContext* ShadingSystem::get_context(PerThreadInfo* threadinfo, TextureSystem::Perthread*) {
    if (threadinfo && !threadinfo->freeContexts.empty()) {
        ShadingContext* c = threadinfo->freeContexts.back().release();
        threadinfo->freeContexts.pop_back();
        return c;
    }
    return new ShadingContext(*m_impl, threadinfo);
}

void ShadingSystem::release_context(ShadingContext* ctx) {
    if (!ctx) return;
    if (ctx->thread) {
        ctx->thread->freeContexts.emplace_back(ctx);
        return;
    }
    delete ctx;
}

bool ShadingSystem::execute(ShadingContext& ctx, ShaderGroup& group, int, ShaderGlobals& globals,
                            void*, void*, bool run) {
    return m_impl->execute(ctx, group, globals, run);
}

bool ShadingSystem::execute(ShadingContext* ctx, ShaderGroup& group, ShaderGlobals& globals,
                            bool run) {
    if (ctx) return m_impl->execute(*ctx, group, globals, run);
    ShadingContext* c = get_context();
    const bool ok = m_impl->execute(*c, group, globals, run);
    release_context(c);
    return ok;
}

const ShaderSymbol* ShadingSystem::find_symbol(const ShaderGroup& group, ustring layername,
                                               ustring symbolname) const {
    if (!group.program) return nullptr;
    const Program& prog = *group.program;
    for (size_t l = prog.layers.size(); l-- > 0;) {
        const ProgramLayer& pl = prog.layers[l];
        if (!layername.empty() && pl.name != layername) continue;
        for (int s = pl.firstSymbol; s < pl.firstSymbol + pl.symbolCount; ++s)
            if (prog.symbols[size_t(s)].name == symbolname && prog.symbols[size_t(s)].hasStorage)
                return &prog.symbols[size_t(s)];
        if (!layername.empty()) return nullptr;
    }
    return nullptr;
}

const ShaderSymbol* ShadingSystem::find_symbol(const ShaderGroup& group, ustring symbolname) const {
    const std::string& full = symbolname.string();
    const size_t dot = full.find('.');
    if (dot != std::string::npos) {
        if (const ShaderSymbol* s =
                find_symbol(group, ustring(full.substr(0, dot)), ustring(full.substr(dot + 1))))
            return s;
    }
    return find_symbol(group, ustring(), symbolname);
}

TypeDesc ShadingSystem::symbol_typedesc(const ShaderSymbol* sym) const {
    if (!sym) return TypeDesc();
    return sym->type;
}

const void* ShadingSystem::symbol_address(const ShadingContext& ctx,
                                          const ShaderSymbol* sym) const {
    if (!sym || !sym->hasStorage || !ctx.heap || ctx.boundSerial != sym->programSerial)
        return nullptr;
    return ctx.heap + sym->offset;
}

const void* ShadingSystem::get_symbol(ShadingContext& ctx, ustring layername, ustring symbolname,
                                      TypeDesc& type) const {
    type = TypeDesc();
    if (!ctx.prog || !ctx.prog->group) return nullptr;
    const ShaderGroup& g = *ctx.prog->group;
    const ShaderSymbol* sym =
        layername.empty() ? find_symbol(g, symbolname) : find_symbol(g, layername, symbolname);
    const void* addr = symbol_address(ctx, sym);
    if (addr) type = sym->type;
    return addr;
}

bool ShadingSystem::execute_init(ShadingContext& ctx, ShaderGroup& group, int, ShaderGlobals& sg,
                                 void*, void*, bool run) {
    return m_impl->executeInit(ctx, group, sg, run);
}

bool ShadingSystem::execute_layer(ShadingContext& ctx, int, ShaderGlobals& sg, void*, void*,
                                  int layernumber) {
    if (ctx.sg != &sg) ctx.sg = &sg;
    return m_impl->executeLayer(ctx, layernumber);
}

bool ShadingSystem::execute_cleanup(ShadingContext& ctx) {
    return m_impl->executeCleanup(ctx);
}

int ShadingSystem::find_layer(const ShaderGroup& group, ustring layername) const {
    return group.findLayer(layername);
}

bool ShadingSystem::ReParameter(ShaderGroup& group, string_view layername, string_view paramname,
                                TypeDesc type, const void* val) {
    ShadingSystemImpl& s = *m_impl;
    const int l = group.findLayer(ustring(layername));
    if (l < 0) {
        s.error("ReParameter: no layer \"" + std::string(layername) + "\" in group \"" +
                group.name.string() + "\"");
        return false;
    }
    ShaderInstance& inst = group.layers[size_t(l)];
    const int sym = inst.master->findSymbol(ustring(paramname));
    if (sym < 0 || !inst.master->symbols[size_t(sym)].isParam()) {
        s.error("ReParameter: layer \"" + std::string(layername) + "\" has no parameter \"" +
                std::string(paramname) + "\"");
        return false;
    }
    const MasterSymbol& ms = inst.master->symbols[size_t(sym)];
    const InstanceValue* old = inst.valueFor(sym);
    const bool geometric = old ? !old->lockgeom : !ms.lockgeom;
    const TypeDesc st = ms.type.simpletype();
    if (!geometric || type.basetype != st.basetype || type.aggregate != st.aggregate ||
        (st.arraylen > 0 && type.arraylen != st.arraylen)) {
        // Constant parameters may have been folded into the code; values of another type
        // would have to be converted: both are refused, leaving the group as it was.
        return false;
    }
    InstanceValue iv;
    iv.symbol = sym;
    iv.type = type;
    iv.lockgeom = false;
    iv.data.assign(static_cast<const char*>(val), static_cast<const char*>(val) + type.size());
    bool replaced = false;
    for (InstanceValue& v : inst.values)
        if (v.symbol == sym) v = iv, replaced = true;
    if (!replaced) inst.values.push_back(iv);
    if (group.program) {
        Program& prog = *group.program;
        const ProgramLayer& pl = prog.layers[size_t(l)];
        const ShaderSymbol& ps = prog.symbols[size_t(pl.firstSymbol + sym)];
        if (ps.hasStorage)
            writeValue(prog.initImage.data() + ps.offset, ps.type, ms, inst.valueFor(sym));
    }
    return true;
}

int ShadingSystem::raytype_bit(ustring name) {
    const auto& types = m_impl->raytypes;
    for (size_t k = 0; k < types.size(); ++k)
        if (types[k] == name) return 1 << k;
    return 0;
}

TextureSystem* ShadingSystem::texturesys() const {
    return m_impl->texsys;
}

RendererServices* ShadingSystem::renderer() const {
    return m_impl->renderer;
}

} // namespace OSL
