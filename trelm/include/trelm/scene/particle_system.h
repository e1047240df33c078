// A simple particle emitter: particles are born at a steady rate, fly with a per-particle
// velocity under gravity and render as small spheres until their life ends.
#pragma once

#include <trelm/scene/object.h>

#include <vector>

namespace TrelmSDK {

// Age and life of particles, as renderers and maps ask for them. Ages and lives are in ticks;
// a particle that is not alive at t has age -1.
class IParticleObject {
public:
    virtual ~IParticleObject() = default;
    virtual int NumParticles() = 0;
    virtual TimeValue GetParticleAge(TimeValue t, int i) = 0;
    virtual TimeValue GetParticleLife(TimeValue t, int i) = 0;
    virtual Point3 GetParticlePosition(TimeValue t, int i) = 0;
};

class ParticleSystem : public Object, public IParticleObject {
public:
    struct Params {
        int count = 50;
        TimeValue emitStart = 0, emitStop = 4800; // ticks over which particles are born
        TimeValue life = 4800;                    // mean life in ticks
        float lifeVariation = 0.25f;              // life varies by up to this fraction
        float speed = 1.0f;                       // units per second
        float spread = 0.3f;                      // sideways speed, fraction of speed
        float gravity = 0.0f;                     // units per second squared, along -Z
        float size = 0.05f;                       // sphere radius
        unsigned seed = 1;
    };
    explicit ParticleSystem(const Params& p);

    std::string ClassName() const override { return "Particles"; }
    bool Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const override;
    Box3 Bound() const override { return bound_; }
    // Places the live particles at time t. The renderer calls it on the main thread before
    // rendering; render threads only read the result.
    void Update(TimeValue t) override;
    IParticleObject* GetParticleInterface() override { return this; }

    int NumParticles() override { return params_.count; }
    TimeValue GetParticleAge(TimeValue t, int i) override;
    TimeValue GetParticleLife(TimeValue t, int i) override;
    Point3 GetParticlePosition(TimeValue t, int i) override;

private:
    TimeValue Birth(int i) const;
    Params params_;
    std::vector<Point3> velocity_;
    std::vector<float> lifeScale_;
    std::vector<int> live_; // indices alive at the last Update
    std::vector<Point3> livePos_;
    Box3 bound_;
};

} // namespace TrelmSDK
