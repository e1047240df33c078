// The viewport shading environment every generated OSL function is compiled against: the
// per-pixel state, the host's view and object matrices, the image size, the 2D sampler type and
// the safe power function with the fast exp2 and log2 behind it.

// The surface point being shaded. The host fills it before it calls a map's function.
struct ksg_ShadingState {
    float3 position;    // P
    float3 normal;      // N
    float3 direction;   // I, the incoming view direction
    float3 geom_normal; // Ng
    float3 tex_coord[4]; // mapping channels; channel 0 holds (u, v, w)
};
static ksg_ShadingState state;

// Row-vector matrices (mul(float4(p, 1), m)), as the host's viewport uses them.
float4x4 ksg_matWorld;
float4x4 ksg_matWorldInverse;
float4x4 ksg_matView;
float4x4 ksg_matViewInverse;
float4x4 ksg_matViewProj;

// Size of the viewport image in pixels.
float __image_x_resolution;
float __image_y_resolution;

// A 2D texture with its sampler. For a sampler input named S the host also supplies
// S_info (x: width, y: height in pixels) and the int input S_alphaMult.
struct ksg_sampler2D {
    Texture2D tex;
    SamplerState smp;
};

// The CPU shading system's fast exp2 and log2 (polynomials on the mantissa), so that pow and
// the functions built on them give its values rather than the device's own approximations.
float ksg_fast_exp2(float value) {
    precise float x = clamp(value, -126.0, 126.0);
    int m = (int)x;
    x -= (float)m;
    x = 1.0 - (1.0 - x); // flushes denormals, as on the CPU
    precise float r = 1.33336498402e-3;
    r = x * r + 9.810352697968e-3;
    r = x * r + 5.551834031939e-2;
    r = x * r + 0.2401793301105;
    r = x * r + 0.693144857883;
    r = x * r + 1.0;
    return asfloat(asuint(r) + ((uint)m << 23));
}

float ksg_fast_log2(float value) {
    float x = clamp(value, 1.175494351e-38, 3.402823466e38);
    uint bits = asuint(x);
    int exponent = (int)(bits >> 23) - 127;
    precise float f = asfloat((bits & 0x007FFFFFu) | 0x3f800000u) - 1.0;
    precise float f2 = f * f;
    precise float f4 = f2 * f2;
    precise float hi = f * -0.00931049621349 + 0.05206469089414;
    precise float lo = f * 0.47868480909345 + -0.72116591947498;
    hi = f * hi + -0.13753123777116;
    hi = f * hi + 0.24187369696082;
    hi = f * hi + -0.34730547155299;
    lo = f * lo + 1.442689881667200;
    precise float result = ((f4 * hi) + (f * lo)) + (float)exponent;
    return result;
}

// pow without NaNs: 0 for a negative base with a fractional exponent, the sign of the base
// for odd integer exponents, 1 for a zero exponent and 0 for a zero base.
float safe_pow(float x, float y) {
    if (y == 0.0)
        return 1.0;
    if (x == 0.0)
        return 0.0;
    if (y == 1.0)
        return x;
    if (y == 2.0)
        return min(x * x, 3.402823466e38);
    float sign = 1.0;
    if (x < 0.0) {
        // An integer exponent has no bits below its binary point; from 2^24 on all are even.
        int bits = asint(y) & 0x7fffffff;
        if (bits < 0x3f800000)
            return 0.0;
        if (bits < 0x4b800000) {
            int fraction = 23 - ((bits >> 23) - 127);
            int whole = bits >> fraction;
            if ((whole << fraction) != bits)
                return 0.0;
            sign = (whole & 1) != 0 ? -1.0 : 1.0;
        }
    }
    precise float result = sign * ksg_fast_exp2(y * ksg_fast_log2(abs(x)));
    return result;
}

float2 safe_pow(float2 x, float2 y) {
    return float2(safe_pow(x.x, y.x), safe_pow(x.y, y.y));
}

float3 safe_pow(float3 x, float3 y) {
    return float3(safe_pow(x.x, y.x), safe_pow(x.y, y.y), safe_pow(x.z, y.z));
}

float3 safe_pow(float3 x, float y) {
    return float3(safe_pow(x.x, y), safe_pow(x.y, y), safe_pow(x.z, y));
}
