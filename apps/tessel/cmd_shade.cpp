// `tessel shade`: runs a shader group over a grid of shading points the way OSL's testshade
// does, with its command line, its console output and its images (through OpenImageIO).
#include "command_registry.h"
#include "shade_renderer.h"

#include <OSL/oslclosure.h>
#ifdef TESSEL_HAVE_OSL_COMPILER
#include <OSL/oslcomp.h>
#endif
#include <OSL/oslexec.h>

#include <OpenImageIO/filesystem.h>
#include <OpenImageIO/imagebuf.h>
#include <OpenImageIO/strutil.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace OSL;
using tessel_shade::GridRenderer;
using tessel_shade::registerClosures;
using tessel_shade::TypedValue;

// Every message goes to stdout in the order it is made, so that shader output, warnings and
// errors interleave as they happened.
class ConsoleErrors final : public ErrorHandler {
public:
    void operator()(int errcode, const std::string& msg) override {
        switch (errcode & 0xffff0000) {
        case EH_ERROR:
            std::printf("ERROR: %s\n", msg.c_str());
            break;
        case EH_SEVERE:
            std::printf("SEVERE ERROR: %s\n", msg.c_str());
            break;
        case EH_WARNING:
            std::printf("WARNING: %s\n", msg.c_str());
            break;
        case EH_INFO:
            std::printf("%s\n", msg.c_str());
            break;
        default:
            std::printf("%s", msg.c_str());
            break;
        }
        std::fflush(stdout);
    }
};

struct OutputRequest {
    std::string symbol, file;
};

struct ShadeOptions {
    int xres = 1, yres = 1;
    int threads = 1;
    int iters = 1;
    bool runstats = false; // print setup, shading and writing times
    bool center = false, varyPdxdy = false, varyUdxdy = false, varyVdxdy = false;
    bool print = false, verbose = false, debug = false;
    float uoffset = 0, voffset = 0, uscale = 1, vscale = 1;
    std::string raytype = "camera";
    std::vector<OutputRequest> outputs;
    std::vector<std::string> entryLayers, entryOutputs;
    std::string reparamLayer;
    std::vector<TypedValue> reparams;
    TypeDesc dataType = TypeDesc::FLOAT; // of every output image
};

// Reads `count` comma-separated floats that make up the whole text.
bool parseFloatList(const std::string& text, float* out, int count) {
    const char* p = text.c_str();
    for (int k = 0; k < count; ++k) {
        char* end = nullptr;
        out[k] = std::strtof(p, &end);
        if (end == p) return false;
        p = end;
        while (*p == ' ') ++p;
        if (k + 1 < count) {
            if (*p != ',') return false;
            ++p;
        }
    }
    return *p == '\0';
}

// Types a value the way testshade does: an explicit ":type=" modifier, else 16 numbers are a
// matrix, 3 a vector, then int, float, and anything else a string.
bool typeValue(const std::string& command, const std::string& name, const std::string& value,
               TypedValue& out) {
    out = TypedValue();
    out.name = name;
    std::string type;
    const size_t colon = command.find(':');
    if (colon != std::string::npos)
        for (const std::string& opt : OIIO::Strutil::splits(command.substr(colon + 1), ":")) {
            const size_t eq = opt.find('=');
            if (eq == std::string::npos) continue;
            const std::string k = opt.substr(0, eq), v = opt.substr(eq + 1);
            if (k == "type") type = v;
            if (k == "lockgeom") out.lockgeom = OIIO::Strutil::stoi(v) != 0;
            if (k == "interpolated") out.lockgeom = OIIO::Strutil::stoi(v) == 0;
        }
    TypeDesc t = type.empty() ? TypeDesc() : TypeDesc(type.c_str());
    if (!type.empty() && t.basetype == TypeDesc::UNKNOWN) {
        std::printf("ERROR: unknown parameter type \"%s\"\n", type.c_str());
        return false;
    }
    auto put = [&](TypeDesc pt, const void* d) {
        out.type = pt;
        out.data.assign(static_cast<const char*>(d), static_cast<const char*>(d) + pt.size());
        return true;
    };
    float f[16];
    const bool unknown = t.basetype == TypeDesc::UNKNOWN;
    if ((unknown || t == TypeMatrix) && parseFloatList(value, f, 16)) return put(TypeMatrix, f);
    if ((unknown ||
         (t.basetype == TypeDesc::FLOAT && t.aggregate == TypeDesc::VEC3 && t.arraylen == 0)) &&
        parseFloatList(value, f, 3))
        return put(unknown ? TypeVector : t, f);
    if ((unknown || t == TypeInt) && OIIO::Strutil::string_is_int(value)) {
        const int i = OIIO::Strutil::stoi(value);
        return put(TypeInt, &i);
    }
    if ((unknown || t == TypeFloat) && OIIO::Strutil::string_is_float(value)) {
        const float x = OIIO::Strutil::stof(value);
        return put(TypeFloat, &x);
    }
    const std::vector<std::string> parts = OIIO::Strutil::splits(value, ",");
    const size_t n = t.numelements() * t.aggregate;
    if (t.basetype == TypeDesc::FLOAT) {
        std::vector<float> v(n, 0.0f);
        for (size_t k = 0; k < n && k < parts.size(); ++k) v[k] = OIIO::Strutil::stof(parts[k]);
        return put(t, v.data());
    }
    if (t.basetype == TypeDesc::INT) {
        std::vector<int> v(n, 0);
        for (size_t k = 0; k < n && k < parts.size(); ++k) v[k] = OIIO::Strutil::stoi(parts[k]);
        return put(t, v.data());
    }
    if (t.basetype == TypeDesc::STRING && t.arraylen > 0) {
        std::vector<ustring> v(n);
        for (size_t k = 0; k < n && k < parts.size(); ++k) v[k] = ustring(parts[k]);
        return put(t, v.data());
    }
    const ustring str(value);
    return put(TypeString, &str);
}

void setupGlobals(ShaderGlobals& sg, const ShadeOptions& o, const GridRenderer& r, int raytypeBit,
                  int x, int y) {
    std::memset(static_cast<void*>(&sg), 0, sizeof sg);
    sg.renderstate = &sg;
    sg.shader2common = r.shaderMatrix();
    sg.object2common = r.objectMatrix();
    sg.raytype = raytypeBit;
    if (o.center) {
        sg.u = o.uscale * (float(x) + 0.5f) / float(o.xres) + o.uoffset;
        sg.v = o.vscale * (float(y) + 0.5f) / float(o.yres) + o.voffset;
        sg.dudx = o.uscale / float(o.xres);
        sg.dvdy = o.vscale / float(o.yres);
    } else {
        sg.u = o.uscale * (o.xres == 1 ? 0.5f : float(x) / float(o.xres - 1)) + o.uoffset;
        sg.v = o.vscale * (o.yres == 1 ? 0.5f : float(y) / float(o.yres - 1)) + o.voffset;
        sg.dudx = o.uscale / float(std::max(1, o.xres - 1));
        sg.dvdy = o.vscale / float(std::max(1, o.yres - 1));
    }
    if (o.varyUdxdy) sg.dudx = 1.0f - sg.u, sg.dudy = sg.u;
    if (o.varyVdxdy) sg.dvdx = 1.0f - sg.v, sg.dvdy = sg.v;
    sg.P = Vec3(sg.u, sg.v, 1.0f);
    if (o.varyPdxdy) {
        sg.dPdx = Vec3(1.0f - sg.u, 1.0f - sg.v, sg.u * 0.5f);
        sg.dPdy = Vec3(1.0f - sg.v, 1.0f - sg.u, sg.v * 0.5f);
    } else {
        sg.dPdx = Vec3(sg.dudx, sg.dudy, 0.0f);
        sg.dPdy = Vec3(sg.dvdx, sg.dvdy, 0.0f);
    }
    sg.dPdu = Vec3(1.0f, 0.0f, 0.0f);
    sg.dPdv = Vec3(0.0f, 1.0f, 0.0f);
    sg.N = Vec3(0.0f, 0.0f, 1.0f);
    sg.Ng = Vec3(0.0f, 0.0f, 1.0f);
    sg.surfacearea = 1.0f;
}

struct OutputImage {
    const ShaderSymbol* sym = nullptr;
    TypeDesc type;
    int channels = 0;
    std::unique_ptr<OIIO::ImageBuf> buf;
};

// Copies the values of the output symbols at one shading point into the images.
void gatherOutputs(ShadingSystem& ss, ShadingContext& ctx, std::vector<OutputImage>& images, int x,
                   int y) {
    for (OutputImage& img : images) {
        if (!img.sym || !img.buf) continue;
        const void* data = ss.symbol_address(ctx, img.sym);
        if (!data) continue;
        float px[16] = {};
        const TypeDesc t = img.type;
        for (int c = 0; c < img.channels; ++c) {
            if (t.basetype == TypeDesc::FLOAT)
                px[c] = static_cast<const float*>(data)[c];
            else if (t.basetype == TypeDesc::INT)
                px[c] = float(static_cast<const int*>(data)[c]);
        }
        img.buf->setpixel(x, y, px, img.channels);
    }
}

// The group attributes testshade's --debug prints.
void printGroupNeeds(ShadingSystem& ss, ShaderGroup& g) {
    auto names = [&](const char* countName, const char* listName, const char* what,
                     const char* unknownName) {
        int n = 0;
        if (!ss.getattribute(&g, countName, TypeInt, &n)) return;
        std::printf("Need %d %s:\n", n, what);
        const ustring* list = nullptr;
        ss.getattribute(&g, listName, TypeDesc::PTR, &list);
        for (int k = 0; k < n && list; ++k) std::printf("    %s\n", list[k].c_str());
        int unknown = 0;
        if (unknownName && ss.getattribute(&g, unknownName, TypeInt, &unknown) && unknown)
            std::printf("    and unknown %s\n", what);
    };
    names("num_textures_needed", "textures_needed", "textures", "unknown_textures_needed");
    names("num_closures_needed", "closures_needed", "closures", "unknown_closures_needed");
    int nglobals = 0;
    if (ss.getattribute(&g, "num_globals_needed", TypeInt, &nglobals)) {
        std::printf("Need %d globals: ", nglobals);
        const ustring* list = nullptr;
        ss.getattribute(&g, "globals_needed", TypeDesc::PTR, &list);
        for (int k = 0; k < nglobals && list; ++k) std::printf(" %s", list[k].c_str());
        std::printf("\n");
    }
}

// The shader an --expr wraps around its expression: outputs "result" and "alpha".
std::string exprShaderSource(const std::string& shadername, const std::string& expr) {
    return "shader " + shadername +
           " (\n"
           "    float s = u [[ int lockgeom=0 ]],\n"
           "    float t = v [[ int lockgeom=0 ]],\n"
           "    output color result = 0,\n"
           "    output float alpha = 1,\n"
           "  )\n"
           "{\n"
           "    " +
           expr +
           "\n"
           "    ;\n"
           "}\n";
}

int runShade(const std::vector<std::string>& args) {
    using Clock = std::chrono::steady_clock;
    const Clock::time_point started = Clock::now();
    ConsoleErrors errors;
    GridRenderer renderer;
    ShadeOptions opt;
    ShadingSystem ss(&renderer, nullptr, &errors);
    registerClosures(ss);
    ss.attribute("lockgeom", 1);

    // Options that apply however late they come are read first, as testshade does.
    std::string groupName;
    for (size_t i = 0; i + 1 < args.size(); ++i)
        if (args[i] == "-groupname" || args[i] == "--groupname") groupName = args[i + 1];

    ShaderGroupRef group = ss.ShaderGroupBegin(groupName);
    std::string pendingLayer;
    std::vector<std::string> connections;
    bool failed = false, groupSpecFailed = false;
    int exprCount = 0;

    for (size_t i = 0; i < args.size(); ++i) {
        const std::string& a = args[i];
        auto need = [&](size_t n) {
            if (i + n >= args.size()) {
                std::printf("ERROR: %s needs %zu argument(s)\n", a.c_str(), n);
                failed = true;
                return false;
            }
            return true;
        };
        std::string base = a;
        while (base.size() > 1 && base[0] == '-' && base[1] == '-') base = base.substr(1);
        const std::string command = base.substr(0, base.find(':'));
        if (base == "-g" || base == "-res") {
            if (!need(2)) break;
            opt.xres = std::max(1, std::atoi(args[i + 1].c_str()));
            opt.yres = std::max(1, std::atoi(args[i + 2].c_str()));
            i += 2;
        } else if (base == "-o") {
            if (!need(2)) break;
            opt.outputs.push_back({args[i + 1], args[i + 2]});
            i += 2;
        } else if (base == "-od" || base == "-d") {
            if (!need(1)) break;
            opt.dataType = TypeDesc(args[i + 1].c_str());
            ++i;
        } else if (base == "-t") {
            if (!need(1)) break;
            opt.threads = std::max(1, std::atoi(args[i + 1].c_str()));
            ++i;
        } else if (base == "-iters") {
            if (!need(1)) break;
            opt.iters = std::max(1, std::atoi(args[i + 1].c_str()));
            ++i;
        } else if (base == "-center") {
            opt.center = true;
        } else if (base == "-vary_pdxdy") {
            opt.varyPdxdy = true;
        } else if (base == "-vary_udxdy") {
            opt.varyUdxdy = true;
        } else if (base == "-vary_vdxdy") {
            opt.varyVdxdy = true;
        } else if (base == "-print") {
            opt.print = true;
        } else if (base == "-offsetuv" || base == "-offsetst") {
            if (!need(2)) break;
            opt.uoffset = OIIO::Strutil::stof(args[i + 1]);
            opt.voffset = OIIO::Strutil::stof(args[i + 2]);
            i += 2;
        } else if (base == "-scaleuv" || base == "-scalest") {
            if (!need(2)) break;
            opt.uscale = OIIO::Strutil::stof(args[i + 1]);
            opt.vscale = OIIO::Strutil::stof(args[i + 2]);
            i += 2;
        } else if (base == "-raytype") {
            if (!need(1)) break;
            opt.raytype = args[++i];
        } else if (base == "-raytype_opt" || base == "-groupoutputs" || base == "-debug2" ||
                   base == "-stats" || base == "-llvm_debug") {
            // The outputs are this group's in any case; the rest concern the reference's JIT.
        } else if (base == "-runstats") {
            opt.runstats = true;
        } else if (base == "-O0" || base == "-O1" || base == "-O2" || base == "-O") {
            ss.attribute("optimize", base == "-O0" ? 0 : base == "-O1" ? 1 : 2);
        } else if (base == "-v") {
            opt.verbose = true;
        } else if (base == "-debug") {
            opt.debug = true;
        } else if (base == "-debugnan") {
            ss.attribute("debug_nan", 1);
        } else if (base == "-debuguninit") {
            ss.attribute("debug_uninit", 1);
        } else if (base == "-groupname") {
            if (!need(1)) break;
            ++i;
        } else if (base == "-group") {
            if (!need(1)) break;
            std::string spec = args[++i];
            std::string text;
            if (OIIO::Filesystem::exists(spec) && OIIO::Filesystem::read_text_file(spec, text))
                spec = text;
            ss.ShaderGroupEnd(*group);
            group = ss.ShaderGroupBegin(groupName, "surface", spec);
            if (!group) {
                groupSpecFailed = true;
                break;
            }
        } else if (base == "-options") {
            if (!need(1)) break;
            for (const std::string& kv : OIIO::Strutil::splits(args[++i], ",")) {
                const size_t eq = kv.find('=');
                if (eq == std::string::npos) continue;
                const std::string k = kv.substr(0, eq), v = kv.substr(eq + 1);
                if (OIIO::Strutil::string_is_int(v))
                    ss.attribute(k, OIIO::Strutil::stoi(v));
                else if (OIIO::Strutil::string_is_float(v))
                    ss.attribute(k, OIIO::Strutil::stof(v));
                else
                    ss.attribute(k, string_view(v));
            }
        } else if (base == "-colorspace") {
            if (!need(1)) break;
            ss.attribute("colorspace", string_view(args[++i]));
        } else if (base == "-texoptions") {
            if (!need(1)) break;
            ss.texturesys()->attribute("options", args[++i]);
        } else if (base == "-entry") {
            if (!need(1)) break;
            opt.entryLayers.push_back(args[++i]);
        } else if (base == "-entryoutput") {
            if (!need(1)) break;
            opt.entryOutputs.push_back(args[++i]);
        } else if (command == "-param") {
            if (!need(2)) break;
            TypedValue v;
            if (typeValue(base, args[i + 1], args[i + 2], v))
                ss.Parameter(*group, v.name, v.type, v.data.data(), v.lockgeom);
            i += 2;
        } else if (command == "-reparam") {
            if (!need(3)) break;
            TypedValue v;
            opt.reparamLayer = args[i + 1];
            if (typeValue(base, args[i + 2], args[i + 3], v)) opt.reparams.push_back(v);
            i += 3;
        } else if (command == "-userdata") {
            if (!need(2)) break;
            TypedValue v;
            if (typeValue(base, args[i + 1], args[i + 2], v)) renderer.userdata.push_back(v);
            i += 2;
        } else if (base == "-layer") {
            if (!need(1)) break;
            pendingLayer = args[++i];
        } else if (base == "-shader") {
            if (!need(2)) break;
            ss.Shader(*group, "surface", args[i + 1], args[i + 2]);
            pendingLayer.clear();
            i += 2;
        } else if (base == "-connect") {
            if (!need(4)) break;
            connections.insert(connections.end(), args.begin() + long(i) + 1,
                               args.begin() + long(i) + 5);
            i += 4;
        } else if (base == "-expr") {
            if (!need(1)) break;
            const std::string shadername = "expr_" + std::to_string(exprCount++);
            const std::string source = exprShaderSource(shadername, args[++i]);
            if (opt.verbose)
                std::printf("Expression-based shader text is:\n---\n%s---\n", source.c_str());
#ifdef TESSEL_HAVE_OSL_COMPILER
            OSLCompiler compiler(&errors);
            std::string oso;
            if (!compiler.compile_buffer(source, oso, {}) ||
                !ss.LoadMemoryCompiledShader(shadername, oso)) {
                std::printf("ERROR: Could not compile \"%s\"\n", shadername.c_str());
                return 1;
            }
#else
            std::printf("ERROR: this build has no OSL compiler for --expr\n");
            return 1;
#endif
            ss.Shader(*group, "surface", shadername, pendingLayer);
            pendingLayer.clear();
        } else if (!a.empty() && a[0] == '-') {
            std::printf("ERROR: unknown option %s\n", a.c_str());
            return 1;
        } else {
            // A shader that cannot be found is reported; the group goes on without it.
            ss.Shader(*group, "surface", a, pendingLayer);
            pendingLayer.clear();
        }
    }
    std::fflush(stdout);
    if (groupSpecFailed || !group) {
        std::fprintf(stderr, "ERROR: Invalid shader group. Exiting testshade.\n");
        return 1;
    }
    if (failed) {
        ss.ShaderGroupEnd(*group);
        return 1;
    }
    for (size_t c = 0; c + 3 < connections.size(); c += 4) {
        std::printf("Connect %s.%s to %s.%s\n", connections[c].c_str(), connections[c + 1].c_str(),
                    connections[c + 2].c_str(), connections[c + 3].c_str());
        std::fflush(stdout);
        if (!ss.ConnectShaders(*group, connections[c], connections[c + 1], connections[c + 2],
                               connections[c + 3]))
            return 1;
    }

    if (!opt.outputs.empty()) {
        std::vector<ustring> names;
        for (const OutputRequest& o : opt.outputs) names.emplace_back(o.symbol);
        ss.attribute(group.get(), "renderer_outputs", TypeDesc(TypeDesc::STRING, int(names.size())),
                     names.data());
    }
    if (!ss.ShaderGroupEnd(*group)) return 1;

    if (opt.verbose) {
        ustring pickle, name;
        ss.getattribute(group.get(), "pickle", TypeString, &pickle);
        ss.getattribute(group.get(), "groupname", TypeString, &name);
        std::printf("Shader group:\n---\n%s\n---\n\n", pickle.c_str());
        std::printf("Shader group \"%s\" layers are:\n", name.c_str());
        int nlayers = 0;
        ss.getattribute(group.get(), "num_layers", TypeInt, &nlayers);
        std::vector<ustring> layers(size_t(std::max(0, nlayers)));
        if (nlayers > 0)
            ss.getattribute(group.get(), "layer_names", TypeDesc(TypeDesc::STRING, nlayers),
                            layers.data());
        for (ustring l : layers) std::printf("    %s\n", l.c_str());
        std::printf("\n");
    }

    if (!opt.outputs.empty()) std::printf("\n");
    if (!opt.entryLayers.empty()) {
        std::vector<ustring> names;
        std::printf("Entry layers:");
        for (const std::string& e : opt.entryLayers) {
            names.emplace_back(e);
            std::printf(" %s(%d)", e.c_str(), ss.find_layer(*group, ustring(e)));
        }
        std::printf("\n");
        if (!ss.attribute(group.get(), "entry_layers",
                          TypeDesc(TypeDesc::STRING, int(names.size())), names.data()))
            return 1;
    }

    std::vector<OutputImage> images(opt.outputs.size());
    for (size_t k = 0; k < opt.outputs.size(); ++k) {
        const OutputRequest& o = opt.outputs[k];
        OutputImage& img = images[k];
        if (o.file != "null") std::printf("Output %s to %s\n", o.symbol.c_str(), o.file.c_str());
        img.sym = ss.find_symbol(*group, ustring(o.symbol));
        if (!img.sym) {
            std::printf("ERROR: Output %s not found, skipping.\n", o.symbol.c_str());
            continue;
        }
        img.type = ss.symbol_typedesc(img.sym);
        img.channels = int(img.type.aggregate) * std::max(1, img.type.arraylen);
        if (img.type.basetype != TypeDesc::FLOAT && img.type.basetype != TypeDesc::INT) {
            std::printf("ERROR: Output %s is not numeric, skipping.\n", o.symbol.c_str());
            img.sym = nullptr;
            continue;
        }
        OIIO::ImageSpec spec(opt.xres, opt.yres, img.channels, opt.dataType);
        img.buf = std::make_unique<OIIO::ImageBuf>(spec);
    }

    // Layers holding the --entryoutput symbols, run in place of the whole group.
    std::vector<int> outputLayers;
    if (!opt.entryOutputs.empty()) {
        std::printf("Entry outputs:");
        for (const std::string& name : opt.entryOutputs) {
            const size_t dot = name.find('.');
            const int layer = dot == std::string::npos
                                  ? ss.find_layer(*group, ustring(name))
                                  : ss.find_layer(*group, ustring(name.substr(0, dot)));
            if (!ss.find_symbol(*group, ustring(name)) || layer < 0) {
                std::printf("\nEntry output %s not found. Aborting.\n", name.c_str());
                return 1;
            }
            outputLayers.push_back(layer);
            std::printf(" %s", name.c_str());
        }
        std::printf("\n");
    }
    if (opt.debug) printGroupNeeds(ss, *group);
    std::fflush(stdout);

    renderer.setResolution(opt.xres, opt.yres);
    const int raytypeBit = ss.raytype_bit(ustring(opt.raytype));
    const int nthreads = std::min(opt.threads, opt.yres);
    const Clock::time_point shadingStarts = Clock::now();
    for (int iter = 0; iter < opt.iters; ++iter) {
        const bool last = iter == opt.iters - 1;
        auto shadeRows = [&](int y0, int y1) {
            PerThreadInfo* ti = ss.create_thread_info();
            ShadingContext* ctx = ss.get_context(ti);
            ShaderGlobals sg;
            for (int y = y0; y < y1; ++y)
                for (int x = 0; x < opt.xres; ++x) {
                    setupGlobals(sg, opt, renderer, raytypeBit, x, y);
                    if (outputLayers.empty()) {
                        ss.execute(*ctx, *group, 0, sg, nullptr, nullptr);
                    } else {
                        ss.execute_init(*ctx, *group, 0, sg, nullptr, nullptr);
                        for (int l : outputLayers)
                            ss.execute_layer(*ctx, 0, sg, nullptr, nullptr, l);
                        ss.execute_cleanup(*ctx);
                    }
                    if (last) gatherOutputs(ss, *ctx, images, x, y);
                }
            ss.release_context(ctx);
            ss.destroy_thread_info(ti);
        };
        if (nthreads <= 1) {
            shadeRows(0, opt.yres);
        } else {
            std::vector<std::thread> pool;
            for (int t = 0; t < nthreads; ++t)
                pool.emplace_back(shadeRows, opt.yres * t / nthreads,
                                  opt.yres * (t + 1) / nthreads);
            for (std::thread& th : pool) th.join();
        }
        // Parameters changed between iterations, as an interactive renderer would.
        if (!last)
            for (const TypedValue& v : opt.reparams)
                ss.ReParameter(*group, opt.reparamLayer, v.name, v.type, v.data.data());
    }

    const Clock::time_point shadingEnds = Clock::now();
    int status = 0;
    if (opt.outputs.empty()) std::printf("\n");
    for (size_t k = 0; k < images.size(); ++k) {
        OutputImage& img = images[k];
        if (!img.buf) continue;
        if (opt.print) {
            for (int y = 0; y < opt.yres; ++y)
                for (int x = 0; x < opt.xres; ++x) {
                    std::printf("Pixel (%d, %d):\n  %s :", x, y, opt.outputs[k].symbol.c_str());
                    for (int c = 0; c < img.channels; ++c)
                        std::printf(" %g", double(img.buf->getchannel(x, y, 0, c)));
                    std::printf("\n");
                }
        }
        if (opt.outputs[k].file == "null") continue;
        if (!img.buf->write(opt.outputs[k].file)) {
            std::printf("ERROR: cannot write %s: %s\n", opt.outputs[k].file.c_str(),
                        img.buf->geterror().c_str());
            status = 1;
        }
    }
    if (opt.runstats) {
        const auto seconds = [](Clock::time_point a, Clock::time_point b) {
            return std::chrono::duration<double>(b - a).count();
        };
        const double run = seconds(shadingStarts, shadingEnds);
        const double points = double(opt.xres) * opt.yres * opt.iters;
        std::printf("Setup: %.3fs\nRun  : %.3fs (%.0f points, %d threads, %.0f points/s)\n"
                    "Write: %.3fs\n",
                    seconds(started, shadingStarts), run, points, std::max(nthreads, 1),
                    run > 0 ? points / run : 0.0, seconds(shadingEnds, Clock::now()));
    }
    std::fflush(stdout);
    return status;
}

const tessel_cli::CommandRegistrar registrar{
    "shade", "Run a shader group over a grid of points (testshade's options)",
    [](CLI::App& sub) -> std::function<int()> {
        sub.allow_extras();
        sub.prefix_command();
        sub.set_help_flag();
        return [&sub] { return runShade(sub.remaining()); };
    }};

} // namespace
