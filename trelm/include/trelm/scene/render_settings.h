// What the user asked the renderer for: output size, pixel aspect, render type and region.
#pragma once

#include <trelm/core/time.h>
#include <trelm/scene/geom_types.h>

namespace TrelmSDK {

enum RenderType {
    RENDTYPE_NORMAL = 0,     // the whole view
    RENDTYPE_REGION = 2,     // only the region is rendered; the rest of the image stays clear
    RENDTYPE_REGION_CROP = 6 // only the region is rendered, and the image is cropped to it
};

struct RenderRegion {
    float x0 = 0, y0 = 0, x1 = 1, y1 = 1; // fractions of the image, from its top-left corner
};

struct RenderSettings {
    int width = 640;
    int height = 480;
    float pixelAspect = 1.0f;
    RenderType type = RENDTYPE_NORMAL;
    RenderRegion region;
    TimeValue time = 0;
    int samplesPerAxis = 1; // supersampling: n x n jittered samples per pixel
    int maxRayDepth = 4;
    bool mapsEnabled = true;
    bool shadows = true;
    Color background{0.05f, 0.05f, 0.07f};

    // Width over height times the pixel aspect.
    float ImageAspect() const { return float(width) / float(height) * pixelAspect; }
};

} // namespace TrelmSDK
