// Base of the host's own 2D maps: turns a context into map coordinates, caches colours per
// sample, and derives mono and bump from the colour lookup.
#pragma once

#include <trelm/core/texmap.h>
#include <trelm/scene/shade_context.h>
#include <trelm/scene/uv_gen.h>

namespace TrelmSDK {

class MappedTexmap : public Texmap {
public:
    UVGen uvGen;

    // Non-zero: stamped into the contexts the map evaluates (the SDK's map base has no G-buffer
    // ID of its own).
    int GetGBufID() const { return gbufID_; }
    void SetGBufID(int id) { gbufID_ = id; }

    AColor EvalColor(ShadeContext& sc) override;
    Point3 EvalNormalPerturb(ShadeContext& sc) override;

    // The colour at map coordinate uv with its screen derivatives; the context is given for
    // sub-maps, which are evaluated at the context's own sample.
    virtual AColor Lookup(ShadeContext& sc, const Point2& uv, const Point2& dx,
                          const Point2& dy) = 0;

private:
    int gbufID_ = 0;
};

} // namespace TrelmSDK
