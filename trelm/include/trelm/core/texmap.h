// The base of texture maps: what the host calls on any map a material or another map uses.
#pragma once

#include <trelm/core/math_types.h>
#include <trelm/core/reference_target.h>

namespace TrelmSDK {

class ShadeContext;

// Materials and maps: a name shown to the user.
class MtlBase : public ReferenceTarget {
public:
    const MSTR& GetName() const { return name_; }
    void SetName(const MSTR& name) { name_ = name; }

protected:
    // Copies the base-material data to a clone.
    void CopyMtlBase(const MtlBase& from) { name_ = from.name_; }

private:
    MSTR name_;
};

// A texture map. Concrete maps (the host's bitmap, checker and noise maps, and plug-in maps)
// implement the evaluation calls; the evaluation calls run on render threads and must not change
// the map, while Update runs on the main thread before rendering.
class Texmap : public MtlBase {
public:
    SClass_ID SuperClassID() const override { return TEXMAP_CLASS_ID; }

    virtual AColor EvalColor(ShadeContext& sc) = 0;
    // Mono value: the mean of the colour channels unless the map knows better.
    virtual float EvalMono(ShadeContext& sc) {
        AColor c = EvalColor(sc);
        return (c.r + c.g + c.b) / 3.0f;
    }
    // Perturbation of the shading normal for bump mapping; none by default.
    virtual Point3 EvalNormalPerturb(ShadeContext& sc) {
        (void)sc;
        return Point3(0, 0, 0);
    }

    // Prepares the map for evaluation at time t and narrows valid to the time its state holds.
    virtual void Update(TimeValue t, Interval& valid) { (void)t, (void)valid; }
    // The interval around t in which the map's output does not change.
    virtual Interval Validity(TimeValue t) {
        (void)t;
        return FOREVER;
    }

    // Sub-texture slots: maps plugged into this one.
    virtual int NumSubTexmaps() { return 0; }
    virtual Texmap* GetSubTexmap(int i) {
        (void)i;
        return nullptr;
    }
    virtual void SetSubTexmap(int i, Texmap* m) { (void)i, (void)m; }
    virtual MSTR GetSubTexmapSlotName(int i, bool localized = true) {
        (void)i, (void)localized;
        return {};
    }
};

} // namespace TrelmSDK

using TrelmSDK::MtlBase;
using TrelmSDK::ShadeContext;
using TrelmSDK::Texmap;
