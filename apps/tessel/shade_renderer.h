// The renderer behind `tessel shade`: the grid's transformations, named spaces and user data,
// and the closures OSL's test renderers know.
#pragma once

#include <OSL/oslexec.h>

#include <map>
#include <string>
#include <vector>

namespace tessel_shade {

using namespace OSL;

// A value typed from the command line: a --param, --reparam or --userdata.
struct TypedValue {
    std::string name;
    TypeDesc type;
    std::vector<char> data;
    bool lockgeom = true;
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

// Registers the closures of OSL's test renderers, in their parameter layouts.
void registerClosures(ShadingSystem& ss);

} // namespace tessel_shade
