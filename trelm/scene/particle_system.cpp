// Particle birth, life and motion, and intersection of the live particles as spheres.
#include <trelm/scene/particle_system.h>

#include <cmath>

namespace TrelmSDK {

namespace {

// Deterministic per-particle random numbers in [0, 1).
float Hash01(unsigned seed, unsigned i, unsigned k) {
    uint32_t h = seed * 0x9E3779B9u ^ (i * 0x85EBCA6Bu) ^ (k * 0xC2B2AE35u);
    h ^= h >> 16, h *= 0x7FEB352Du, h ^= h >> 15, h *= 0x846CA68Bu, h ^= h >> 16;
    return float(h >> 8) / float(1u << 24);
}

} // namespace

ParticleSystem::ParticleSystem(const Params& p) : params_(p) {
    if (params_.count < 0) params_.count = 0;
    velocity_.resize(params_.count);
    lifeScale_.resize(params_.count);
    for (int i = 0; i < params_.count; ++i) {
        const float a = Hash01(params_.seed, i, 0) * 6.2831853f;
        const float r = std::sqrt(Hash01(params_.seed, i, 1)) * params_.spread;
        velocity_[i] = Point3(std::cos(a) * r, std::sin(a) * r, 1.0f) * params_.speed;
        lifeScale_[i] = 1.0f + params_.lifeVariation * (2 * Hash01(params_.seed, i, 2) - 1);
    }
}

TimeValue ParticleSystem::Birth(int i) const {
    if (params_.count <= 1) return params_.emitStart;
    const double span = double(params_.emitStop) - double(params_.emitStart);
    return params_.emitStart + TimeValue(span * i / params_.count);
}

TimeValue ParticleSystem::GetParticleLife(TimeValue t, int i) {
    (void)t;
    if (i < 0 || i >= params_.count) return -1;
    return TimeValue(std::lround(params_.life * double(lifeScale_[i])));
}

TimeValue ParticleSystem::GetParticleAge(TimeValue t, int i) {
    if (i < 0 || i >= params_.count) return -1;
    const TimeValue age = t - Birth(i);
    return age >= 0 && age < GetParticleLife(t, i) ? age : -1;
}

Point3 ParticleSystem::GetParticlePosition(TimeValue t, int i) {
    const TimeValue age = GetParticleAge(t, i);
    if (age < 0) return Point3(0);
    const float s = float(age) / TICKS_PER_SECOND;
    return velocity_[i] * s + Point3(0, 0, -0.5f * params_.gravity * s * s);
}

void ParticleSystem::Update(TimeValue t) {
    live_.clear();
    livePos_.clear();
    bound_ = Box3();
    for (int i = 0; i < params_.count; ++i) {
        if (GetParticleAge(t, i) < 0) continue;
        const Point3 p = GetParticlePosition(t, i);
        live_.push_back(i);
        livePos_.push_back(p);
        bound_.extendBy(p - Point3(params_.size));
        bound_.extendBy(p + Point3(params_.size));
    }
}

bool ParticleSystem::Intersect(const Ray& ray, float tmin, float tmax, SurfaceHit& hit) const {
    const float r = params_.size;
    bool found = false;
    const float a = ray.dir.dot(ray.dir);
    if (a == 0) return false;
    for (size_t k = 0; k < live_.size(); ++k) {
        const Point3 o = ray.p - livePos_[k];
        const float b = o.dot(ray.dir);
        const float c = o.dot(o) - r * r;
        const float disc = b * b - a * c;
        if (disc < 0) continue;
        const float s = std::sqrt(disc);
        float t = (-b - s) / a;
        if (!(t > tmin && t < tmax)) t = (-b + s) / a;
        if (!(t > tmin && t < tmax)) continue;
        tmax = t;
        found = true;
        const Point3 n = (o + ray.dir * t) / r;
        hit.t = t;
        hit.p = livePos_[k] + n * r;
        hit.ng = hit.n = n.normalized();
        float phi = std::atan2(n.y, n.x);
        if (phi < 0) phi += 6.2831853f;
        hit.uvw = Point3(phi / 6.2831853f,
                         1 - std::acos(std::fmax(-1.f, std::fmin(1.f, n.z))) / 3.14159265f, 0);
        hit.dpdu = Point3(-n.y, n.x, 0) * (6.2831853f * r);
        hit.dpdv = hit.n.cross(hit.dpdu).normalized() * (3.14159265f * r);
        hit.dpdw = hit.n;
        hit.face = live_[k];
        hit.mtlNum = live_[k]; // the particle index, as maps asking for particle data expect
    }
    return found;
}

} // namespace TrelmSDK
