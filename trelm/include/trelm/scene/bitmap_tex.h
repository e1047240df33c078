// The bitmap map: an image file read through OpenImageIO's texture system, filtered by the
// sample's footprint, tiled or clamped, and converted into the rendering colour space.
#pragma once

#include <trelm/scene/color_pipeline.h>
#include <trelm/scene/mapped_texmap.h>

#include <memory>
#include <string>

namespace TrelmSDK {

class BitmapTex : public MappedTexmap {
public:
    enum class Filter { Smart, Bilinear, Closest };

    BitmapTex();
    ~BitmapTex() override;
    Class_ID ClassID() const override { return Class_ID(0x240, 0); }
    void GetClassName(MSTR& s, bool localized = true) const override {
        (void)localized;
        s = L"Bitmap";
    }

    // Takes effect at the next Update().
    void SetFileName(std::string path) { file_ = std::move(path), loaded_ = false; }
    const std::string& GetFileName() const { return file_; }
    bool tileU = true, tileV = true; // repeat outside 0..1; else clamp to the edge
    Filter filter = Filter::Smart;
    // Colour space of the file's pixels: "automatic" or a space the pipeline knows.
    std::string colorSpace = "automatic";
    bool alphaFromFile = true;

    // Opens the file and reads its description. On failure the map evaluates black with alpha
    // 0 and LastError() says why.
    void Update(TimeValue t, Interval& valid) override;
    const std::string& LastError() const { return error_; }
    bool IsLoaded() const { return loaded_ && handle_ != nullptr; }
    int Channels() const { return channels_; }

    AColor Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx, const Point2& dy) override;

private:
    std::string file_;
    std::string error_;
    bool loaded_ = false;
    void* handle_ = nullptr; // the texture system's handle; written in Update, read by renders
    int channels_ = 0;
    std::shared_ptr<const ColorConverter> converter_;
};

} // namespace TrelmSDK
