// The host's shading context: everything a texture map may ask about the one sample it shades.
// The renderer fills one per sample; maps read it, and may cache per-sample results in it.
#pragma once

#include <trelm/core/class_id.h>
#include <trelm/core/time.h>
#include <trelm/scene/geom_types.h>

#include <array>
#include <cstdint>

namespace TrelmSDK {

class INode;
class Object;
class Texmap;
class RenderGlobalContext;
class BaseInterface;

// Reference frames a context converts between. The context's own (internal) frame is the
// camera frame: P(), V(), the normals and all derivatives are given in camera space.
enum RefFrame { REF_CAMERA = 0, REF_WORLD = 1, REF_OBJECT = 2 };

enum ProjectionType { PROJ_PERSPECTIVE = 0, PROJ_PARALLEL = 1 };

// Small fixed-capacity cache of values keyed by the object that computed them. It lives in a
// context, which belongs to one render thread, so it needs no lock.
template <typename T, int Capacity = 16>
class SampleCache {
public:
    bool Get(const void* key, T& value) const {
        for (int i = 0; i < count_; ++i)
            if (slots_[i].key == key) return value = slots_[i].value, true;
        return false;
    }
    void Put(const void* key, const T& value) {
        for (int i = 0; i < count_; ++i)
            if (slots_[i].key == key) return void(slots_[i].value = value);
        // When full, the oldest entry makes room: a miss only costs a re-evaluation.
        int at = count_ < Capacity ? count_++ : (next_++ % Capacity);
        slots_[at] = {key, value};
    }
    void Clear() { count_ = 0, next_ = 0; }
    int Size() const { return count_; }

private:
    struct Slot {
        const void* key;
        T value;
    };
    std::array<Slot, Capacity> slots_{};
    int count_ = 0;
    int next_ = 0;
};

class ShadeContext {
public:
    virtual ~ShadeContext() = default;

    // Sample state the renderer sets directly (host style public members).
    bool doMaps = true;    // false: maps must not be evaluated for this sample
    bool backFace = false; // the viewer sees the back of the surface (against GNormal())
    int mtlNum = 0;        // sub-material number; for particle systems the particle index
    int rayLevel = 0;      // 0 for camera rays, +1 per bounce
    int gbufId = 0;
    RenderGlobalContext* globContext = nullptr; // null outside a render

    // Position and view.
    virtual Point3 P() = 0;
    // Change of P for one pixel step to the right (DPdx) and one pixel step up (DPdy).
    virtual Point3 DPdx() { return Point3(0); }
    virtual Point3 DPdy() { return Point3(0); }
    // Approximate footprint: |DPdx| + |DPdy| as a vector per axis.
    virtual Point3 DP();
    // Unit vector from the eye towards P.
    virtual Point3 V() = 0;
    virtual Point3 CamPos() { return Point3(0); }
    virtual int ProjType() { return PROJ_PERSPECTIVE; }

    // Normals are the surface's own (outward) ones; BackFace() says whether the viewer looks
    // at the other side.
    virtual Point3 Normal() = 0;
    virtual void SetNormal(const Point3& n) = 0;
    virtual Point3 OrigNormal() { return Normal(); }
    virtual Point3 GNormal() = 0;
    virtual bool BackFace() { return backFace; }
    virtual Point3 ReflectVector();
    virtual Point3 RefractVector(float ior);
    virtual float Curve() { return 0; }

    // Mapping channels: coordinate, pixel footprint (sum of the absolute x and y changes) and
    // exact screen derivatives of the coordinate.
    virtual Point3 UVW(int chan = 1) = 0;
    virtual Point3 DUVW(int chan = 1) = 0;
    virtual void UVWDerivatives(int chan, Point3& ddx, Point3& ddy) {
        (void)chan, ddx = Point3(0), ddy = Point3(0);
    }
    // Derivatives of P with respect to U, V and W of a channel.
    virtual void DPdUVW(Point3 dP[3], int chan = 1) = 0;
    // Unit tangent directions of increasing U and V in the surface; false when there are none.
    virtual bool BumpBasisVectors(Point3 dP[2], int axis, int chan = 1) {
        (void)dP, (void)axis, (void)chan;
        return false;
    }
    virtual Point3 BarycentricCoords() { return Point3(0); }
    virtual int FaceNumber() { return 0; }

    // Frame conversions from the internal frame to ito, and from ifrom to the internal frame.
    virtual Point3 PointTo(const Point3& p, RefFrame ito) = 0;
    virtual Point3 PointFrom(const Point3& p, RefFrame ifrom) = 0;
    virtual Point3 VectorTo(const Point3& v, RefFrame ito) = 0;
    virtual Point3 VectorFrom(const Point3& v, RefFrame ifrom) = 0;
    // MatrixTo(f) maps internal to f; MatrixFrom(f) maps f to internal, so object to world is
    // MatrixFrom(REF_OBJECT) * MatrixTo(REF_WORLD).
    virtual Matrix3 MatrixTo(RefFrame ito) = 0;
    virtual Matrix3 MatrixFrom(RefFrame ifrom) = 0;
    virtual Box3 ObjectBox() { return Box3(); }

    // What is being shaded.
    virtual INode* Node() { return nullptr; }
    virtual int NodeID(); // the node's render ID, -1 without a node
    virtual Object* GetEvalObject() { return nullptr; }
    virtual TimeValue CurTime() = 0;
    virtual Point2 ScreenUV() { return Point2(0); }
    virtual bool InMtlEditor() { return false; }
    virtual AColor EvalEnvironMap(Texmap* map, const Point3& view);

    virtual void SetGBufferID(int id) { gbufId = id; }
    int GBufferID() const { return gbufId; }

    // Further interfaces a context may offer (e.g. ray tracing); null when not offered.
    virtual BaseInterface* GetInterface(const Interface_ID& id) {
        (void)id;
        return nullptr;
    }

    // Per-sample caches keyed by the object asking. A renderer clears them between samples.
    virtual bool GetCache(const Texmap* map, AColor& c) { return colorCache_.Get(map, c); }
    virtual bool GetCache(const Texmap* map, float& f) { return floatCache_.Get(map, f); }
    virtual bool GetCache(const Texmap* map, Point3& p) { return vectorCache_.Get(map, p); }
    virtual void PutCache(const Texmap* map, const AColor& c) { colorCache_.Put(map, c); }
    virtual void PutCache(const Texmap* map, float f) { floatCache_.Put(map, f); }
    virtual void PutCache(const Texmap* map, const Point3& p) { vectorCache_.Put(map, p); }
    virtual void ClearCache() { colorCache_.Clear(), floatCache_.Clear(), vectorCache_.Clear(); }

private:
    SampleCache<AColor> colorCache_;
    SampleCache<float> floatCache_;
    SampleCache<Point3> vectorCache_;
};

} // namespace TrelmSDK
