// Texture coordinates of a map: which mapping channel it reads, with tiling, offset and a
// rotation about W, applied to the coordinate and to its screen derivatives alike.
#pragma once

#include <trelm/scene/geom_types.h>

namespace TrelmSDK {

class ShadeContext;

struct UVGen {
    int channel = 1;
    float uTiling = 1, vTiling = 1;
    float uOffset = 0, vOffset = 0;
    float wAngle = 0; // degrees

    // The map's coordinate for a channel coordinate: rotate about the tile centre, then tile
    // and offset.
    Point2 Apply(const Point2& uv) const;
    // The same linear part on a derivative.
    Point2 ApplyToDerivative(const Point2& d) const;

    // Coordinate and screen derivatives of the context's sample.
    void GetUV(ShadeContext& sc, Point2& uv, Point2& dx, Point2& dy) const;
};

} // namespace TrelmSDK
