// Pixel access and writing of rendered images.
#include <trelm/render/render_image.h>
#include <trelm/scene/color_pipeline.h>

#include <OpenImageIO/imagebuf.h>
#include <OpenImageIO/imageio.h>

#include <algorithm>
#include <cctype>
#include <filesystem>

namespace TrelmSDK {

void RenderImage::Resize(int w, int h) {
    width = std::max(w, 0);
    height = std::max(h, 0);
    pixels.assign(size_t(width) * size_t(height) * 4, 0.0f);
}

AColor RenderImage::At(int x, int y) const {
    const float* p = &pixels[(size_t(y) * size_t(width) + size_t(x)) * 4];
    return AColor(p[0], p[1], p[2], p[3]);
}

void RenderImage::Set(int x, int y, const AColor& c) {
    float* p = &pixels[(size_t(y) * size_t(width) + size_t(x)) * 4];
    p[0] = c.r, p[1] = c.g, p[2] = c.b, p[3] = c.a;
}

bool RenderImage::Write(const std::string& path, std::string& error) const {
    if (width <= 0 || height <= 0) {
        error = "the image is empty";
        return false;
    }
    auto out = OIIO::ImageOutput::create(path);
    if (!out) {
        error = "cannot write '" + path + "': " + OIIO::geterror();
        return false;
    }
    std::string ext = std::filesystem::path(path).extension().string();
    for (char& c : ext) c = char(std::tolower(static_cast<unsigned char>(c)));
    const bool floatFormat = ext == ".exr" || ext == ".hdr" || ext == ".tif" || ext == ".tiff";

    std::vector<float> data = pixels;
    ColorPipelineManager& cm = GetColorPipelineMgr();
    if (!floatFormat && cm.IsColorManagementActive()) {
        if (auto conv = cm.GetConverter(cm.RenderingSpace(), "sRGB"))
            conv->ConvertArray(data.data(), size_t(width) * size_t(height), 4 * sizeof(float));
    }
    const int channels = out->supports("alpha") ? 4 : 3;
    OIIO::ImageSpec spec(width, height, channels,
                         floatFormat ? OIIO::TypeDesc::FLOAT : OIIO::TypeDesc::UINT8);
    const bool encoded = !floatFormat && cm.IsColorManagementActive();
    spec.attribute("oiio:ColorSpace", encoded ? "sRGB" : "Linear");
    if (channels == 3) {
        std::vector<float> rgb(size_t(width) * size_t(height) * 3);
        for (size_t i = 0; i < size_t(width) * size_t(height); ++i)
            for (int c = 0; c < 3; ++c) rgb[i * 3 + c] = data[i * 4 + c];
        data.swap(rgb);
    }
    if (!out->open(path, spec) || !out->write_image(OIIO::TypeDesc::FLOAT, data.data()) ||
        !out->close()) {
        error = "cannot write '" + path + "': " + out->geterror();
        return false;
    }
    return true;
}

} // namespace TrelmSDK
