// Colour spaces, converters and the process-wide colour pipeline settings.
#include <trelm/core/notifications.h>
#include <trelm/scene/color_pipeline.h>

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstring>

namespace TrelmSDK {

namespace {

struct SpaceInfo {
    const char* name;
    ColorConverter::Transfer transfer;
    bool ap1; // ACES AP1 primaries; else Rec.709
};

const SpaceInfo kSpaces[] = {
    {"sRGB", ColorConverter::Transfer::SRGB, false},
    {"linear", ColorConverter::Transfer::Linear, false},
    {"ACEScg", ColorConverter::Transfer::Linear, true},
    {"raw", ColorConverter::Transfer::Linear, false},
};

// Linear Rec.709 to ACEScg (AP1) with the Bradford adaptation from D65 to the ACES white.
const Imath::M33f kRec709ToAP1(0.6130974024f, 0.3395231462f, 0.0473794514f, //
                               0.0701937225f, 0.9163538791f, 0.0134523985f, //
                               0.0206155929f, 0.1095697729f, 0.8698146342f);

std::string Lower(std::string s) {
    for (char& c : s) c = char(std::tolower(static_cast<unsigned char>(c)));
    return s;
}

const SpaceInfo* Find(const std::string& name) {
    const std::string c = ColorPipelineManager::Canonical(name);
    for (const SpaceInfo& s : kSpaces)
        if (c == s.name) return &s;
    return nullptr;
}

float DecodeSRGB(float v) {
    return v <= 0.04045f ? v / 12.92f : std::pow((v + 0.055f) / 1.055f, 2.4f);
}
float EncodeSRGB(float v) {
    return v <= 0.0031308f ? v * 12.92f : 1.055f * std::pow(v, 1.0f / 2.4f) - 0.055f;
}

Imath::V3f Apply(const Imath::M33f& m, const Imath::V3f& c) {
    return Imath::V3f(m[0][0] * c.x + m[0][1] * c.y + m[0][2] * c.z,
                      m[1][0] * c.x + m[1][1] * c.y + m[1][2] * c.z,
                      m[2][0] * c.x + m[2][1] * c.y + m[2][2] * c.z);
}

} // namespace

Color ColorConverter::Convert(const Color& c) const {
    Imath::V3f v(c.x, c.y, c.z);
    if (from_ == Transfer::SRGB) v = {DecodeSRGB(v.x), DecodeSRGB(v.y), DecodeSRGB(v.z)};
    v = Apply(m_, v);
    if (to_ == Transfer::SRGB) v = {EncodeSRGB(v.x), EncodeSRGB(v.y), EncodeSRGB(v.z)};
    return Color(v.x, v.y, v.z);
}

void ColorConverter::ConvertArray(float* data, size_t count, size_t strideBytes) const {
    auto* bytes = reinterpret_cast<unsigned char*>(data);
    for (size_t i = 0; i < count; ++i) {
        float px[3];
        std::memcpy(px, bytes + i * strideBytes, sizeof px);
        const Color c = Convert(Color(px[0], px[1], px[2]));
        px[0] = c.x, px[1] = c.y, px[2] = c.z;
        std::memcpy(bytes + i * strideBytes, px, sizeof px);
    }
}

std::vector<std::string> ColorPipelineManager::ColorSpaces() {
    std::vector<std::string> names;
    for (const SpaceInfo& s : kSpaces) names.push_back(s.name);
    return names;
}

std::string ColorPipelineManager::Canonical(const std::string& name) {
    const std::string l = Lower(name);
    if (l == "linear rec.709" || l == "lin_rec709" || l == "linear rec709" || l == "lin_srgb")
        return "linear";
    if (l == "srgb_texture" || l == "srgb texture") return "sRGB";
    if (l == "acescg" || l == "lin_ap1") return "ACEScg";
    for (const SpaceInfo& s : kSpaces)
        if (l == Lower(s.name)) return s.name;
    return {};
}

void ColorPipelineManager::SetColorManagementActive(bool on) {
    if (on == active_) return;
    active_ = on;
    Changed();
}

bool ColorPipelineManager::SetRenderingSpace(const std::string& name) {
    const std::string c = Canonical(name);
    if (c.empty() || c == "raw") return false;
    if (c == renderingSpace_) return true;
    renderingSpace_ = c;
    Changed();
    return true;
}

std::shared_ptr<const ColorConverter> ColorPipelineManager::GetConverter(const std::string& from,
                                                                         const std::string& to,
                                                                         std::string* error) const {
    const SpaceInfo* a = Find(from);
    const SpaceInfo* b = Find(to);
    if (!a || !b) {
        if (error) *error = "unknown colour space '" + (a ? to : from) + "'";
        return nullptr;
    }
    const std::string key = std::string(a->name) + ">" + b->name;
    std::lock_guard<std::mutex> lock(cacheMutex_);
    for (auto& [k, conv] : cache_)
        if (k == key) return conv;
    Imath::M33f m; // identity
    bool raw = std::strcmp(a->name, "raw") == 0 || std::strcmp(b->name, "raw") == 0;
    if (!raw && a->ap1 != b->ap1) m = a->ap1 ? kRec709ToAP1.inverse() : kRec709ToAP1;
    auto conv = std::make_shared<const ColorConverter>(
        raw ? ColorConverter::Transfer::Linear : a->transfer, m,
        raw ? ColorConverter::Transfer::Linear : b->transfer);
    cache_.emplace_back(key, conv);
    return conv;
}

std::string ColorPipelineManager::FileColorSpace(const std::string& declared, bool isFloat) {
    const std::string c = Canonical(declared);
    if (!c.empty()) return c;
    return isFloat ? "linear" : "sRGB";
}

void ColorPipelineManager::Changed() {
    for (auto& fn : listeners_) fn();
    BroadcastNotification(NOTIFY_COLOR_MANAGEMENT_CHANGED, this);
}

ColorPipelineManager& GetColorPipelineMgr() {
    static ColorPipelineManager mgr;
    return mgr;
}

} // namespace TrelmSDK
