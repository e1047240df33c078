// The host's colour pipeline: named colour spaces, whether colour management is on, the
// rendering space, and converters between spaces.
#pragma once

#include <trelm/scene/geom_types.h>

#include <Imath/ImathMatrix.h>

#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace TrelmSDK {

// Broadcast (parameter: the manager) when colour management is switched or the rendering space
// changes.
inline constexpr int NOTIFY_COLOR_MANAGEMENT_CHANGED = 272;

// Converts colours from one space to another: decode the source transfer curve, change primaries,
// encode the target curve. Immutable once made, so any thread may use it.
class ColorConverter {
public:
    enum class Transfer { Linear, SRGB };
    ColorConverter(Transfer from, const Imath::M33f& primaries, Transfer to)
        : from_(from), to_(to), m_(primaries) {}

    Color Convert(const Color& c) const;
    AColor Convert(const AColor& c) const {
        const Color rgb = Convert(RGB(c));
        return AColor(rgb.x, rgb.y, rgb.z, c.a);
    }
    // In place over count pixels whose first three floats are RGB, stride bytes apart.
    void ConvertArray(float* data, size_t count, size_t strideBytes) const;

    // Matrix from source to target primaries, applied to column vectors of linear RGB.
    const Imath::M33f& Primaries() const { return m_; }

private:
    Transfer from_, to_;
    Imath::M33f m_;
};

// Process-wide (see GetColorPipelineMgr). The settings are written on the main thread; converters
// may be asked for from any thread.
class ColorPipelineManager {
public:
    // Known colour spaces: "sRGB", "linear" (linear Rec.709 primaries), "ACEScg", "raw" (no
    // conversion ever). Names compare without regard to case; "Linear Rec.709" and
    // "lin_rec709" are other names of "linear".
    static std::vector<std::string> ColorSpaces();
    // The canonical name of a space, or empty when unknown.
    static std::string Canonical(const std::string& name);

    bool IsColorManagementActive() const { return active_; }
    void SetColorManagementActive(bool on);
    const std::string& RenderingSpace() const { return renderingSpace_; }
    // False (and nothing changes) for an unknown or "raw" space.
    bool SetRenderingSpace(const std::string& name);

    // A converter between two spaces; null with error set for an unknown space. Converters are
    // cached per pair.
    std::shared_ptr<const ColorConverter> GetConverter(const std::string& from,
                                                       const std::string& to,
                                                       std::string* error = nullptr) const;
    // A converter from a space into the rendering space.
    std::shared_ptr<const ColorConverter> ToRenderingSpace(const std::string& from,
                                                           std::string* error = nullptr) const {
        return GetConverter(from, renderingSpace_, error);
    }
    // The space an image file's pixels are in when a lookup says "automatic": what the file
    // declares (OpenImageIO's "oiio:ColorSpace"), else sRGB for 8- and 16-bit integer data and
    // linear for floating point.
    static std::string FileColorSpace(const std::string& declared, bool isFloat);

    // Called on the main thread after a setting changed, before the notification is broadcast.
    void AddChangeListener(std::function<void()> fn) { listeners_.push_back(std::move(fn)); }

private:
    void Changed();
    bool active_ = true;
    std::string renderingSpace_ = "linear";
    std::vector<std::function<void()>> listeners_;
    mutable std::mutex cacheMutex_; // guards cache_: any thread asks for converters
    mutable std::vector<std::pair<std::string, std::shared_ptr<const ColorConverter>>> cache_;
};

ColorPipelineManager& GetColorPipelineMgr();

} // namespace TrelmSDK
