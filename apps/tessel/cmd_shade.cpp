// `tessel shade`: runs a shader group over a grid of shading points the way OSL's testshade
// does, with its command line, its console output and its images (through OpenImageIO).
#include "command_registry.h"

#include <OSL/oslclosure.h>
#ifdef TESSEL_HAVE_OSL_COMPILER
#include <OSL/oslcomp.h>
#endif
#include <OSL/oslexec.h>

#include <OpenImageIO/filesystem.h>
#include <OpenImageIO/imagebuf.h>
#include <OpenImageIO/strutil.h>

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

// A value typed from the command line: a --param, --reparam or --userdata.
struct TypedValue {
    std::string name;
    TypeDesc type;
    std::vector<char> data;
    bool lockgeom = true;
};

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

// The renderer of the grid: "shader" and "object" space are fixed transformations and
// "myspace" the only named one. The camera sits at the origin of common space, so transforming
// into "camera" (or screen, NDC, raster) works while transforming out of it is unknown, as in
// testshade.
class GridRenderer final : public RendererServices {
public:
    GridRenderer() {
        m_shader.translate(Vec3(1.0f, 0.0f, 0.0f));
        m_shader.rotate(Vec3(0.0f, 0.0f, float(M_PI_4)));
        m_object.translate(Vec3(0.0f, 1.0f, 0.0f));
        m_object.rotate(Vec3(0.0f, 0.0f, float(M_PI_2)));
        Matrix44 myspace;
        myspace.scale(Vec3(1.0f, 2.0f, 1.0f));
        m_named[ustring("myspace")] = myspace;
    }
    void setResolution(int x, int y) { m_xres = x, m_yres = y; }

    // The camera of the grid: a perspective view of the unit square.
    bool get_attribute(ShaderGlobals*, bool derivatives, ustring, TypeDesc type, ustring name,
                       void* val) override {
        const std::string_view n = name.string();
        auto floats = [&](std::initializer_list<float> v) {
            if (type != TypeDesc(TypeDesc::FLOAT, int(v.size())) &&
                !(v.size() == 1 && type == TypeFloat))
                return false;
            float* out = static_cast<float*>(val);
            int k = 0;
            for (float f : v) out[k++] = f;
            if (derivatives) std::memset(out + k, 0, 2 * v.size() * sizeof(float));
            return true;
        };
        if (n == "camera:resolution" && type == TypeDesc(TypeDesc::INT, 2)) {
            static_cast<int*>(val)[0] = m_xres;
            static_cast<int*>(val)[1] = m_yres;
            return true;
        }
        if (n == "camera:projection" && type == TypeString) {
            *static_cast<ustring*>(val) = ustring("perspective");
            return true;
        }
        if (n == "camera:fov") return floats({90.0f});
        if (n == "camera:pixelaspect") return floats({1.0f});
        if (n == "camera:clip_near") return floats({0.1f});
        if (n == "camera:clip_far") return floats({1000.0f});
        if (n == "camera:clip") return floats({0.1f, 1000.0f});
        if (n == "camera:shutter_open") return floats({0.0f});
        if (n == "camera:shutter_close") return floats({1.0f});
        if (n == "camera:shutter") return floats({0.0f, 1.0f});
        if (n == "camera:screen_window") {
            const float aspect = float(m_xres) / float(m_yres);
            return floats({-aspect, -1.0f, aspect, 1.0f});
        }
        return false;
    }
    bool get_matrix(ShaderGlobals*, Matrix44& result, TransformationPtr xform, float) override {
        if (!xform) return false;
        result = *static_cast<const Matrix44*>(xform);
        return true;
    }
    bool get_matrix(ShaderGlobals*, Matrix44& result, ustring from, float) override {
        auto it = m_named.find(from);
        if (it == m_named.end()) return false;
        result = it->second;
        return true;
    }
    bool get_matrix(ShaderGlobals* sg, Matrix44& result, TransformationPtr xform) override {
        return get_matrix(sg, result, xform, 0.0f);
    }
    bool get_matrix(ShaderGlobals* sg, Matrix44& result, ustring from) override {
        return get_matrix(sg, result, from, 0.0f);
    }
    bool get_inverse_matrix(ShaderGlobals*, Matrix44& result, ustring to, float) override {
        if (to == "camera" || to == "screen" || to == "NDC" || to == "raster") {
            result = cameraToSpace(to);
            return true;
        }
        auto it = m_named.find(to);
        if (it == m_named.end()) return false;
        result = it->second.inverse();
        return true;
    }
    bool get_inverse_matrix(ShaderGlobals* sg, Matrix44& result, ustring to) override {
        return get_inverse_matrix(sg, result, to, 0.0f);
    }
    // Geometry data of the grid: values given with --userdata, and "s" and "t" following u
    // and v.
    bool get_userdata(bool derivatives, ustring name, TypeDesc type, ShaderGlobals* sg,
                      void* val) override {
        for (const TypedValue& u : userdata) {
            if (u.name != name.string()) continue;
            const TypeDesc ut = u.type;
            const size_t n = type.numelements() * type.aggregate;
            const size_t have = ut.numelements() * ut.aggregate;
            if (ut.basetype == TypeDesc::STRING || type.basetype == TypeDesc::STRING) {
                if (ut != type) return false;
                std::memcpy(val, u.data.data(), type.size());
                return true;
            }
            if (have != n && have != 1) return false;
            for (size_t k = 0; k < n; ++k) {
                const size_t from = have == 1 ? 0 : k;
                const float f = ut.basetype == TypeDesc::INT
                                    ? float(reinterpret_cast<const int*>(u.data.data())[from])
                                    : reinterpret_cast<const float*>(u.data.data())[from];
                if (type.basetype == TypeDesc::INT)
                    static_cast<int*>(val)[k] = int(f);
                else
                    static_cast<float*>(val)[k] = f;
            }
            if (derivatives && type.basetype == TypeDesc::FLOAT)
                std::memset(static_cast<float*>(val) + n, 0, 2 * n * sizeof(float));
            return true;
        }
        if (type != TypeFloat || (name != "s" && name != "t")) return false;
        float* out = static_cast<float*>(val);
        const bool isS = name == "s";
        out[0] = isS ? sg->u : sg->v;
        if (derivatives) {
            out[1] = isS ? sg->dudx : sg->dvdx;
            out[2] = isS ? sg->dudy : sg->dvdy;
        }
        return true;
    }
    // Common (= camera) space to the camera's screen, NDC or raster space: a 90 degree
    // perspective with clipping planes at 0.1 and 1000 and the screen spanning [-1, 1]
    // vertically.
    Matrix44 cameraToSpace(ustring to) const {
        Matrix44 m; // the camera is common space itself
        if (to == "camera") return m;
        const float hither = 0.1f, yon = 1000.0f;
        const float depth = yon - hither;
        const float invTan = 1.0f / std::tan(0.5f * 90.0f * float(M_PI) / 180.0f);
        m = m * Matrix44(invTan, 0, 0, 0, 0, invTan, 0, 0, 0, 0, yon / depth, 1, 0, 0,
                         -yon * hither / depth, 0);
        if (to == "screen") return m;
        m = m * Matrix44(0.5f, 0, 0, 0, 0, 0.5f, 0, 0, 0, 0, 1, 0, 0.5f, 0.5f, 0, 1);
        if (to == "NDC") return m;
        return m * Matrix44(float(m_xres), 0, 0, 0, 0, float(m_yres), 0, 0, 0, 0, 1, 0, 0, 0, 0, 1);
    }
    const Matrix44* shaderMatrix() const { return &m_shader; }
    const Matrix44* objectMatrix() const { return &m_object; }

private:
    Matrix44 m_shader, m_object;
    std::map<ustring, Matrix44> m_named;
    int m_xres = 1, m_yres = 1;

public:
    std::vector<TypedValue> userdata; // set before shading starts, read-only while it runs
};

// The closures a renderer of this kind knows, in the layouts OSL's test renderers use.
struct EmptyParams {};
struct DiffuseParams {
    Vec3 N;
    ustring label;
};
struct OrenNayarParams {
    Vec3 N;
    float sigma;
};
struct TranslucentParams {
    Vec3 N;
    ustring label;
};
struct PhongParams {
    Vec3 N;
    float exponent;
    ustring label;
};
struct WardParams {
    Vec3 N, T;
    float ax, ay;
};
struct MicrofacetParams {
    ustring dist;
    Vec3 N, U;
    float xalpha, yalpha, eta;
    int refract;
};
struct ReflectionParams {
    Vec3 N;
    float eta;
};
struct DebugParams {
    ustring tag;
};
// A closure taking one parameter of every kind, positional and keyword, to show how each
// travels from the shader to the renderer.
struct ParameterTestParams {
    int intParam;
    float floatParam;
    Color3 colorParam;
    Vec3 vectorParam;
    ustring stringParam;
    int intArray[5];
    Vec3 vectorArray[5];
    Color3 colorArray[5];
    float floatArray[5];
    ustring stringArray[5];
    int intKey;
    float floatKey;
    Color3 colorKey;
    Vec3 vectorKey;
    ustring stringKey;
};

void registerClosures(ShadingSystem& ss) {
    const ClosureParam none[] = {CLOSURE_FINISH_PARAM(EmptyParams)};
    const ClosureParam diffuse[] = {CLOSURE_VECTOR_PARAM(DiffuseParams, N),
                                    CLOSURE_STRING_KEYPARAM(DiffuseParams, label, "label"),
                                    CLOSURE_FINISH_PARAM(DiffuseParams)};
    const ClosureParam oren[] = {CLOSURE_VECTOR_PARAM(OrenNayarParams, N),
                                 CLOSURE_FLOAT_PARAM(OrenNayarParams, sigma),
                                 CLOSURE_FINISH_PARAM(OrenNayarParams)};
    const ClosureParam translucent[] = {CLOSURE_VECTOR_PARAM(TranslucentParams, N),
                                        CLOSURE_FINISH_PARAM(TranslucentParams)};
    const ClosureParam phong[] = {
        CLOSURE_VECTOR_PARAM(PhongParams, N), CLOSURE_FLOAT_PARAM(PhongParams, exponent),
        CLOSURE_STRING_KEYPARAM(PhongParams, label, "label"), CLOSURE_FINISH_PARAM(PhongParams)};
    const ClosureParam ward[] = {
        CLOSURE_VECTOR_PARAM(WardParams, N), CLOSURE_VECTOR_PARAM(WardParams, T),
        CLOSURE_FLOAT_PARAM(WardParams, ax), CLOSURE_FLOAT_PARAM(WardParams, ay),
        CLOSURE_FINISH_PARAM(WardParams)};
    const ClosureParam microfacet[] = {CLOSURE_STRING_PARAM(MicrofacetParams, dist),
                                       CLOSURE_VECTOR_PARAM(MicrofacetParams, N),
                                       CLOSURE_VECTOR_PARAM(MicrofacetParams, U),
                                       CLOSURE_FLOAT_PARAM(MicrofacetParams, xalpha),
                                       CLOSURE_FLOAT_PARAM(MicrofacetParams, yalpha),
                                       CLOSURE_FLOAT_PARAM(MicrofacetParams, eta),
                                       CLOSURE_INT_PARAM(MicrofacetParams, refract),
                                       CLOSURE_FINISH_PARAM(MicrofacetParams)};
    const ClosureParam reflection[] = {CLOSURE_VECTOR_PARAM(ReflectionParams, N),
                                       CLOSURE_FINISH_PARAM(ReflectionParams)};
    const ClosureParam fresnel[] = {CLOSURE_VECTOR_PARAM(ReflectionParams, N),
                                    CLOSURE_FLOAT_PARAM(ReflectionParams, eta),
                                    CLOSURE_FINISH_PARAM(ReflectionParams)};
    const ClosureParam debug[] = {CLOSURE_STRING_PARAM(DebugParams, tag),
                                  CLOSURE_FINISH_PARAM(DebugParams)};
    using PT = ParameterTestParams;
    const ClosureParam parameterTest[] = {CLOSURE_INT_PARAM(PT, intParam),
                                          CLOSURE_FLOAT_PARAM(PT, floatParam),
                                          CLOSURE_COLOR_PARAM(PT, colorParam),
                                          CLOSURE_VECTOR_PARAM(PT, vectorParam),
                                          CLOSURE_STRING_PARAM(PT, stringParam),
                                          CLOSURE_INT_ARRAY_PARAM(PT, intArray, 5),
                                          CLOSURE_VECTOR_ARRAY_PARAM(PT, vectorArray, 5),
                                          CLOSURE_COLOR_ARRAY_PARAM(PT, colorArray, 5),
                                          CLOSURE_FLOAT_ARRAY_PARAM(PT, floatArray, 5),
                                          CLOSURE_STRING_ARRAY_PARAM(PT, stringArray, 5),
                                          CLOSURE_INT_KEYPARAM(PT, intKey, "int_key"),
                                          CLOSURE_FLOAT_KEYPARAM(PT, floatKey, "float_key"),
                                          CLOSURE_COLOR_KEYPARAM(PT, colorKey, "color_key"),
                                          CLOSURE_VECTOR_KEYPARAM(PT, vectorKey, "vector_key"),
                                          CLOSURE_STRING_KEYPARAM(PT, stringKey, "string_key"),
                                          CLOSURE_FINISH_PARAM(PT)};
    ss.register_closure("emission", 1, none, nullptr, nullptr);
    ss.register_closure("background", 2, none, nullptr, nullptr);
    ss.register_closure("diffuse", 3, diffuse, nullptr, nullptr);
    ss.register_closure("oren_nayar", 4, oren, nullptr, nullptr);
    ss.register_closure("translucent", 5, translucent, nullptr, nullptr);
    ss.register_closure("phong", 6, phong, nullptr, nullptr);
    ss.register_closure("ward", 7, ward, nullptr, nullptr);
    ss.register_closure("microfacet", 8, microfacet, nullptr, nullptr);
    ss.register_closure("reflection", 9, reflection, nullptr, nullptr);
    ss.register_closure("reflection", 10, fresnel, nullptr, nullptr);
    ss.register_closure("refraction", 11, fresnel, nullptr, nullptr);
    ss.register_closure("transparent", 12, none, nullptr, nullptr);
    ss.register_closure("debug", 13, debug, nullptr, nullptr);
    ss.register_closure("holdout", 14, none, nullptr, nullptr);
    ss.register_closure("parameter_test", 15, parameterTest, nullptr, nullptr);
}

struct OutputRequest {
    std::string symbol, file;
};

struct ShadeOptions {
    int xres = 1, yres = 1;
    int threads = 1;
    int iters = 1;
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
                   base == "-stats" || base == "-runstats" || base == "-llvm_debug") {
            // The outputs are this group's in any case; the rest concern the reference's JIT.
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
