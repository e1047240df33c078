// The bitmap map: OpenImageIO texture lookups filtered by the sample footprint, with tiling
// and conversion into the rendering colour space.
#include <trelm/scene/bitmap_tex.h>

#include <OpenImageIO/texture.h>

#include <algorithm>

namespace TrelmSDK {

namespace {

// One texture system for every bitmap map, made on first use. It is deliberately never
// destroyed: maps may be evaluated until process exit, and OpenImageIO's own statics may
// already be gone when ours are torn down.
OIIO::TextureSystem* BitmapTextureSystem() {
    static OIIO::TextureSystem* ts = [] {
        OIIO::TextureSystem* t = OIIO::TextureSystem::create(false);
        // Images without MIP levels get them in memory, so that minified lookups filter.
        t->attribute("automip", 1);
        return t;
    }();
    return ts;
}

} // namespace

BitmapTex::BitmapTex() = default;
BitmapTex::~BitmapTex() = default;

void BitmapTex::Update(TimeValue t, Interval& valid) {
    (void)t, (void)valid;
    if (loaded_) return;
    loaded_ = true;
    handle_ = nullptr;
    channels_ = 0;
    converter_.reset();
    error_.clear();
    if (file_.empty()) {
        error_ = "no image file given";
        return;
    }
    OIIO::TextureSystem* ts = BitmapTextureSystem();
    OIIO::TextureSystem::TextureHandle* h = ts->get_texture_handle(OIIO::ustring(file_));
    OIIO::ImageSpec spec;
    if (!h || !ts->get_imagespec(h, nullptr, 0, spec)) {
        error_ = "cannot read image '" + file_ + "'";
        const std::string why = ts->geterror();
        if (!why.empty()) error_ += ": " + why;
        return;
    }
    channels_ = std::min(spec.nchannels, 4);
    std::string space = colorSpace;
    if (ColorPipelineManager::Canonical(space) == "raw")
        space.clear();
    else if (space.empty() || space == "automatic")
        space = ColorPipelineManager::FileColorSpace(spec.get_string_attribute("oiio:ColorSpace"),
                                                     spec.format.is_floating_point());
    ColorPipelineManager& cm = GetColorPipelineMgr();
    if (!space.empty() && cm.IsColorManagementActive()) {
        std::string why;
        converter_ = cm.ToRenderingSpace(space, &why);
        if (!converter_) {
            error_ = why;
            return;
        }
    }
    handle_ = h;
}

AColor BitmapTex::Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx, const Point2& dy) {
    (void)sc;
    if (!handle_) return AColor(0, 0, 0, 0);
    OIIO::TextureOpt opt;
    opt.swrap = tileU ? OIIO::TextureOpt::WrapPeriodic : OIIO::TextureOpt::WrapClamp;
    opt.twrap = tileV ? OIIO::TextureOpt::WrapPeriodic : OIIO::TextureOpt::WrapClamp;
    opt.interpmode = filter == Filter::Smart      ? OIIO::TextureOpt::InterpSmartBicubic
                     : filter == Filter::Bilinear ? OIIO::TextureOpt::InterpBilinear
                                                  : OIIO::TextureOpt::InterpClosest;
    // Image rows run downwards while V runs upwards.
    float res[4] = {0, 0, 0, 1};
    const bool ok = BitmapTextureSystem()->texture(
        static_cast<OIIO::TextureSystem::TextureHandle*>(handle_), nullptr, opt, uv.x, 1 - uv.y,
        dx.x, -dx.y, dy.x, -dy.y, channels_, res);
    if (!ok) return AColor(0, 0, 0, 0);
    AColor c;
    switch (channels_) {
    case 1:
        c = AColor(res[0], res[0], res[0], 1);
        break;
    case 2:
        c = AColor(res[0], res[0], res[0], res[1]);
        break;
    case 3:
        c = AColor(res[0], res[1], res[2], 1);
        break;
    default:
        c = AColor(res[0], res[1], res[2], res[3]);
        break;
    }
    if (!alphaFromFile) c.a = 1;
    if (converter_) c = converter_->Convert(c);
    return c;
}

} // namespace TrelmSDK
