// Renderable geometry: an object intersects rays in its own frame and reports the surface it hit
// with its mapping coordinates; mapping channels derive further coordinates from channel 1.
#pragma once

#include <trelm/core/time.h>
#include <trelm/scene/geom_types.h>

#include <map>
#include <string>

namespace TrelmSDK {

class IParticleObject;

// What a ray hit, in the object's frame. The channel-1 coordinate and its position derivatives
// come from the object's own parameterisation.
struct SurfaceHit {
    float t = 0;
    Point3 p{0};
    Point3 ng{0, 0, 1}; // unit geometric normal, outward
    Point3 n{0, 0, 1};  // unit shading normal, outward
    Point3 uvw{0};
    Point3 dpdu{0}, dpdv{0}, dpdw{0};
    Point3 bary{0};
    int face = 0;
    int mtlNum = 0;
};

// Scale and offset that make a mapping channel from the object's own coordinates.
struct ChannelMapping {
    Point3 scale{1};
    Point3 offset{0};
};

class Object {
public:
    virtual ~Object() = default;
    virtual std::string ClassName() const = 0;

    // Nearest hit with tmin < t < tmax of a ray given in the object's frame.
    virtual bool Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const = 0;
    virtual Box3 Bound() const = 0;
    // Brings time-dependent state to time t; main thread, before rendering.
    virtual void Update(TimeValue t) { (void)t; }
    virtual IParticleObject* GetParticleInterface() { return nullptr; }

    // Channel 1 is the object's own coordinates unless remapped; other channels exist once set.
    void SetChannel(int chan, const ChannelMapping& m) { channels_[chan] = m; }
    bool HasChannel(int chan) const { return chan == 1 || channels_.count(chan) != 0; }
    const ChannelMapping* Channel(int chan) const;

private:
    std::map<int, ChannelMapping> channels_;
};

} // namespace TrelmSDK
