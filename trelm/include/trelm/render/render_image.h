// A rendered image: linear RGBA floats, written through OpenImageIO.
#pragma once

#include <trelm/scene/geom_types.h>

#include <string>
#include <vector>

namespace TrelmSDK {

struct RenderImage {
    int width = 0, height = 0;
    std::vector<float> pixels; // RGBA, rows from the top

    void Resize(int w, int h);
    AColor At(int x, int y) const;
    void Set(int x, int y, const AColor& c);

    // Writes the image; the format follows the extension. Formats that store floating point
    // (EXR, HDR, TIFF float) get the linear values; 8- and 16-bit formats get them encoded for
    // display (sRGB) when colour management is on. False with error set on failure.
    bool Write(const std::string& path, std::string& error) const;
};

} // namespace TrelmSDK
