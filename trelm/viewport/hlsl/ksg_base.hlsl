// The viewport shading environment every generated OSL function is compiled against: the
// per-pixel state, the host's view and object matrices, the image size, the 2D sampler type and
// the safe power function.

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
        if (frac(y) != 0.0)
            return 0.0;
        if (abs(y) < 16777216.0 && fmod(abs(y), 2.0) == 1.0)
            sign = -1.0;
    }
    return sign * pow(abs(x), y);
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
