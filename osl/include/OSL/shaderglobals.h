// The per-sample state a renderer hands to the shading system: the shader's global variables
// and opaque pointers passed back to the renderer services.
#pragma once

#include <OSL/oslconfig.h>

namespace OSL {

struct ClosureColor;
class ShadingContext;
class RendererServices;

// Whatever the renderer uses to stand for a (possibly animated) transformation.
typedef const void* TransformationPtr;

// Field order and types are those of OSL 1.12; renderers fill it by name and shaders read it by
// offset, so it must not be reordered.
struct ShaderGlobals {
    Vec3 P, dPdx, dPdy;
    Vec3 dPdz;
    Vec3 I, dIdx, dIdy;
    Vec3 N;
    Vec3 Ng;
    float u, dudx, dudy;
    float v, dvdx, dvdy;
    Vec3 dPdu, dPdv;
    float time;
    float dtime;
    Vec3 dPdtime;
    Vec3 Ps, dPsdx, dPsdy;
    void* renderstate;
    void* tracedata;
    void* objdata;
    ShadingContext* context;
    TransformationPtr object2common;
    TransformationPtr shader2common;
    ClosureColor* Ci;
    float surfacearea;
    int raytype;
    int flipHandedness;
    int backfacing;
};

// Bits of ShaderGlobals::raytype for the ray types the system knows by default.
enum RayType {
    CAMERA = 1,
    SHADOW = 2,
    REFLECTION = 4,
    REFRACTION = 8,
    DIFFUSE = 16,
    GLOSSY = 32,
    SUBSURFACE = 64,
    DISPLACEMENT = 128
};

} // namespace OSL
