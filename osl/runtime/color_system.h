// The colour system shading works in: the RGB primaries named by the "colorspace" attribute, its
// conversions to and from XYZ and the other built-in spaces, blackbody and spectral colours.
#pragma once

#include <OSL/dual.h>
#include <OSL/oslconfig.h>

#include <OpenImageIO/color.h>

#include <mutex>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace OSL {

using DColor = Dual2<Vec3>;

class ColorSystem {
public:
    // CIE xy chromaticities of the three primaries and the white point.
    struct Chroma {
        float xRed, yRed, xGreen, yGreen, xBlue, yBlue, xWhite, yWhite;
    };

    // The system of a named colour space ("Rec709", "ACEScg", ...); null for an unknown name.
    // Systems are built once, on first use, and never change afterwards.
    static const ColorSystem* find(std::string_view name);
    // The named system, or Rec709 when the name is unknown.
    static const ColorSystem& findOrDefault(std::string_view name);
    static const Chroma* chromaticities(std::string_view name);

    ustring name() const { return m_name; }
    const Matrix33& xyzToRgbMatrix() const { return m_xyzToRgb; }
    const Matrix33& rgbToXyzMatrix() const { return m_rgbToXyz; }
    const Vec3& luminanceWeights() const { return m_luminance; }

    Vec3 xyzToRgb(const Vec3& xyz) const { return xyz * m_xyzToRgb; }
    Vec3 rgbToXyz(const Vec3& rgb) const { return rgb * m_rgbToXyz; }
    float luminance(const Vec3& rgb) const { return rgb.dot(m_luminance); }
    Dual2<float> luminance(const DColor& rgb) const;

    // RGB of a black body at temperature T (Kelvin).
    Vec3 blackbody(float kelvin) const;
    // RGB of light of a single wavelength (nanometres), scaled so components stay within [0,1].
    Vec3 wavelengthColor(float nm) const;

    // Whether `space` is one this system converts itself (RGB, hsv, hsl, YIQ, XYZ, xyY, sRGB,
    // linear or the system's own name); other names need an external colour configuration.
    bool isBuiltin(ustring space) const;
    // "RGB", "rgb", "linear" or this system's own name: spaces holding the colour unchanged.
    bool isRgbName(ustring space) const;
    // Converts between two built-in spaces; false (and `out` untouched) when either is not one.
    bool transform(ustring from, ustring to, const Vec3& c, Vec3& out) const;
    bool transform(ustring from, ustring to, const DColor& c, DColor& out) const;
    // What the colour constructor does with a named space: built-in spaces other than sRGB and
    // linear convert to RGB; false for anything else.
    bool toRgb(ustring from, const Vec3& c, Vec3& rgb) const;

    explicit ColorSystem(const char* name, const Chroma& chroma);

private:
    template <class T>
    bool transformT(ustring from, ustring to, const T& c, T& out) const;

    ustring m_name;
    Matrix33 m_xyzToRgb, m_rgbToXyz;
    Vec3 m_luminance;
    std::vector<Vec3> m_blackbodyTable; // fifth roots, on a non-linear temperature scale
};

// Conversions the built-in colour system does not know, through the OpenColorIO configuration
// OpenImageIO finds (the OCIO environment variable). The configuration is read on first use.
// Threads: lookups of a pair of spaces are cached behind a mutex; kernels resolve constant space
// names once when the program is built, so only shaders with varying space names reach the lock.
class ExternalColorTransforms {
public:
    static ExternalColorTransforms& instance();
    // The processor converting `from` to `to`; null when the configuration has no such spaces.
    OIIO::ColorProcessorHandle find(ustring from, ustring to);
    // Applies a processor to a colour (derivatives follow by finite differences).
    static Vec3 apply(const OIIO::ColorProcessor& p, const Vec3& c);
    static DColor apply(const OIIO::ColorProcessor& p, const DColor& c);

private:
    std::mutex m_mutex;
    std::unique_ptr<OIIO::ColorConfig> m_config; // guarded by m_mutex
    std::unordered_map<std::string, OIIO::ColorProcessorHandle> m_cache;
};

} // namespace OSL
