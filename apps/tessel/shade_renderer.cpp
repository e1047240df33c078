// The closures `tessel shade` knows, in the layouts OSL's test renderers use.
#include "shade_renderer.h"

#include <OSL/oslclosure.h>

namespace tessel_shade {

namespace {

// The closures a renderer of this kind knows, in the layouts OSL's test renderers use.
struct EmptyParams {};
struct DiffuseParams {
    Vec3 N;
    ustring label;
};
struct OrenNayarParams {
    Vec3 N;
    float sigma;
};
struct TranslucentParams {
    Vec3 N;
    ustring label;
};
struct PhongParams {
    Vec3 N;
    float exponent;
    ustring label;
};
struct WardParams {
    Vec3 N, T;
    float ax, ay;
};
struct MicrofacetParams {
    ustring dist;
    Vec3 N, U;
    float xalpha, yalpha, eta;
    int refract;
};
struct ReflectionParams {
    Vec3 N;
    float eta;
};
struct DebugParams {
    ustring tag;
};
// A closure taking one parameter of every kind, positional and keyword, to show how each
// travels from the shader to the renderer.
struct ParameterTestParams {
    int intParam;
    float floatParam;
    Color3 colorParam;
    Vec3 vectorParam;
    ustring stringParam;
    int intArray[5];
    Vec3 vectorArray[5];
    Color3 colorArray[5];
    float floatArray[5];
    ustring stringArray[5];
    int intKey;
    float floatKey;
    Color3 colorKey;
    Vec3 vectorKey;
    ustring stringKey;
};

} // namespace

void registerClosures(ShadingSystem& ss) {
    const ClosureParam none[] = {CLOSURE_FINISH_PARAM(EmptyParams)};
    const ClosureParam diffuse[] = {CLOSURE_VECTOR_PARAM(DiffuseParams, N),
                                    CLOSURE_STRING_KEYPARAM(DiffuseParams, label, "label"),
                                    CLOSURE_FINISH_PARAM(DiffuseParams)};
    const ClosureParam oren[] = {CLOSURE_VECTOR_PARAM(OrenNayarParams, N),
                                 CLOSURE_FLOAT_PARAM(OrenNayarParams, sigma),
                                 CLOSURE_FINISH_PARAM(OrenNayarParams)};
    const ClosureParam translucent[] = {CLOSURE_VECTOR_PARAM(TranslucentParams, N),
                                        CLOSURE_FINISH_PARAM(TranslucentParams)};
    const ClosureParam phong[] = {
        CLOSURE_VECTOR_PARAM(PhongParams, N), CLOSURE_FLOAT_PARAM(PhongParams, exponent),
        CLOSURE_STRING_KEYPARAM(PhongParams, label, "label"), CLOSURE_FINISH_PARAM(PhongParams)};
    const ClosureParam ward[] = {
        CLOSURE_VECTOR_PARAM(WardParams, N), CLOSURE_VECTOR_PARAM(WardParams, T),
        CLOSURE_FLOAT_PARAM(WardParams, ax), CLOSURE_FLOAT_PARAM(WardParams, ay),
        CLOSURE_FINISH_PARAM(WardParams)};
    const ClosureParam microfacet[] = {CLOSURE_STRING_PARAM(MicrofacetParams, dist),
                                       CLOSURE_VECTOR_PARAM(MicrofacetParams, N),
                                       CLOSURE_VECTOR_PARAM(MicrofacetParams, U),
                                       CLOSURE_FLOAT_PARAM(MicrofacetParams, xalpha),
                                       CLOSURE_FLOAT_PARAM(MicrofacetParams, yalpha),
                                       CLOSURE_FLOAT_PARAM(MicrofacetParams, eta),
                                       CLOSURE_INT_PARAM(MicrofacetParams, refract),
                                       CLOSURE_FINISH_PARAM(MicrofacetParams)};
    const ClosureParam reflection[] = {CLOSURE_VECTOR_PARAM(ReflectionParams, N),
                                       CLOSURE_FINISH_PARAM(ReflectionParams)};
    const ClosureParam fresnel[] = {CLOSURE_VECTOR_PARAM(ReflectionParams, N),
                                    CLOSURE_FLOAT_PARAM(ReflectionParams, eta),
                                    CLOSURE_FINISH_PARAM(ReflectionParams)};
    const ClosureParam debug[] = {CLOSURE_STRING_PARAM(DebugParams, tag),
                                  CLOSURE_FINISH_PARAM(DebugParams)};
    using PT = ParameterTestParams;
    const ClosureParam parameterTest[] = {CLOSURE_INT_PARAM(PT, intParam),
                                          CLOSURE_FLOAT_PARAM(PT, floatParam),
                                          CLOSURE_COLOR_PARAM(PT, colorParam),
                                          CLOSURE_VECTOR_PARAM(PT, vectorParam),
                                          CLOSURE_STRING_PARAM(PT, stringParam),
                                          CLOSURE_INT_ARRAY_PARAM(PT, intArray, 5),
                                          CLOSURE_VECTOR_ARRAY_PARAM(PT, vectorArray, 5),
                                          CLOSURE_COLOR_ARRAY_PARAM(PT, colorArray, 5),
                                          CLOSURE_FLOAT_ARRAY_PARAM(PT, floatArray, 5),
                                          CLOSURE_STRING_ARRAY_PARAM(PT, stringArray, 5),
                                          CLOSURE_INT_KEYPARAM(PT, intKey, "int_key"),
                                          CLOSURE_FLOAT_KEYPARAM(PT, floatKey, "float_key"),
                                          CLOSURE_COLOR_KEYPARAM(PT, colorKey, "color_key"),
                                          CLOSURE_VECTOR_KEYPARAM(PT, vectorKey, "vector_key"),
                                          CLOSURE_STRING_KEYPARAM(PT, stringKey, "string_key"),
                                          CLOSURE_FINISH_PARAM(PT)};
    ss.register_closure("emission", 1, none, nullptr, nullptr);
    ss.register_closure("background", 2, none, nullptr, nullptr);
    ss.register_closure("diffuse", 3, diffuse, nullptr, nullptr);
    ss.register_closure("oren_nayar", 4, oren, nullptr, nullptr);
    ss.register_closure("translucent", 5, translucent, nullptr, nullptr);
    ss.register_closure("phong", 6, phong, nullptr, nullptr);
    ss.register_closure("ward", 7, ward, nullptr, nullptr);
    ss.register_closure("microfacet", 8, microfacet, nullptr, nullptr);
    ss.register_closure("reflection", 9, reflection, nullptr, nullptr);
    ss.register_closure("reflection", 10, fresnel, nullptr, nullptr);
    ss.register_closure("refraction", 11, fresnel, nullptr, nullptr);
    ss.register_closure("transparent", 12, none, nullptr, nullptr);
    ss.register_closure("debug", 13, debug, nullptr, nullptr);
    ss.register_closure("holdout", 14, none, nullptr, nullptr);
    ss.register_closure("parameter_test", 15, parameterTest, nullptr, nullptr);
}

} // namespace tessel_shade
