// Viewport versions of OSL's error function, expm1, spectral colours and colour-space
// conversions; they follow the CPU shading system's formulas and constants.

// x with the sign of s.
float ksg_copysign(float x, float s) {
    return asfloat((asuint(x) & 0x7fffffffu) | (asuint(s) & 0x80000000u));
}

// Abramowitz and Stegun 7.1.28, evaluated as the CPU shading system does; absolute error
// below 2e-6.
float fast_erf(float x) {
    const float a1 = 0.0705230784, a2 = 0.0422820123, a3 = 0.0092705272;
    const float a4 = 0.0001520143, a5 = 0.0002765672, a6 = 0.0000430638;
    precise float a = 1.0 - (1.0 - abs(x)); // flushes denormals, as on the CPU
    precise float r = ((((((a6 * a + a5) * a + a4) * a + a3) * a + a2) * a + a1) * a + 1.0);
    precise float r2 = r * r;
    precise float r4 = r2 * r2;
    precise float r8 = r4 * r4;
    precise float r16 = r8 * r8;
    precise float e = 1.0 - 1.0 / r16;
    return ksg_copysign(e, x);
}

float3 fast_erf(float3 x) { return float3(fast_erf(x.x), fast_erf(x.y), fast_erf(x.z)); }

float ksg_fast_exp(float x) { return ksg_fast_exp2(x * 1.44269504088896341); }

// exp(x) - 1 through the fast exp, with its Taylor start near 0 where the difference would
// cancel.
float fast_expm1(float x) {
    if (abs(x) < 0.03) {
        precise float y = 1.0 - (1.0 - x);
        precise float r = 0.5 * (y * y) + y;
        return ksg_copysign(r, x);
    }
    precise float r = ksg_fast_exp(x) - 1.0;
    return r;
}

float3 fast_expm1(float3 x) {
    return float3(fast_expm1(x.x), fast_expm1(x.y), fast_expm1(x.z));
}

// CIE 1931 colour matching functions (x-bar, y-bar, z-bar) from 380 nm to 780 nm every 5 nm.
static const float3 ksg_cie_cmf[81] = {
    float3(0.0014, 0.0000, 0.0065), float3(0.0022, 0.0001, 0.0105), float3(0.0042, 0.0001, 0.0201),
    float3(0.0076, 0.0002, 0.0362), float3(0.0143, 0.0004, 0.0679), float3(0.0232, 0.0006, 0.1102),
    float3(0.0435, 0.0012, 0.2074), float3(0.0776, 0.0022, 0.3713), float3(0.1344, 0.0040, 0.6456),
    float3(0.2148, 0.0073, 1.0391), float3(0.2839, 0.0116, 1.3856), float3(0.3285, 0.0168, 1.6230),
    float3(0.3483, 0.0230, 1.7471), float3(0.3481, 0.0298, 1.7826), float3(0.3362, 0.0380, 1.7721),
    float3(0.3187, 0.0480, 1.7441), float3(0.2908, 0.0600, 1.6692), float3(0.2511, 0.0739, 1.5281),
    float3(0.1954, 0.0910, 1.2876), float3(0.1421, 0.1126, 1.0419), float3(0.0956, 0.1390, 0.8130),
    float3(0.0580, 0.1693, 0.6162), float3(0.0320, 0.2080, 0.4652), float3(0.0147, 0.2586, 0.3533),
    float3(0.0049, 0.3230, 0.2720), float3(0.0024, 0.4073, 0.2123), float3(0.0093, 0.5030, 0.1582),
    float3(0.0291, 0.6082, 0.1117), float3(0.0633, 0.7100, 0.0782), float3(0.1096, 0.7932, 0.0573),
    float3(0.1655, 0.8620, 0.0422), float3(0.2257, 0.9149, 0.0298), float3(0.2904, 0.9540, 0.0203),
    float3(0.3597, 0.9803, 0.0134), float3(0.4334, 0.9950, 0.0087), float3(0.5121, 1.0000, 0.0057),
    float3(0.5945, 0.9950, 0.0039), float3(0.6784, 0.9786, 0.0027), float3(0.7621, 0.9520, 0.0021),
    float3(0.8425, 0.9154, 0.0018), float3(0.9163, 0.8700, 0.0017), float3(0.9786, 0.8163, 0.0014),
    float3(1.0263, 0.7570, 0.0011), float3(1.0567, 0.6949, 0.0010), float3(1.0622, 0.6310, 0.0008),
    float3(1.0456, 0.5668, 0.0006), float3(1.0026, 0.5030, 0.0003), float3(0.9384, 0.4412, 0.0002),
    float3(0.8544, 0.3810, 0.0002), float3(0.7514, 0.3210, 0.0001), float3(0.6424, 0.2650, 0.0000),
    float3(0.5419, 0.2170, 0.0000), float3(0.4479, 0.1750, 0.0000), float3(0.3608, 0.1382, 0.0000),
    float3(0.2835, 0.1070, 0.0000), float3(0.2187, 0.0816, 0.0000), float3(0.1649, 0.0610, 0.0000),
    float3(0.1212, 0.0446, 0.0000), float3(0.0874, 0.0320, 0.0000), float3(0.0636, 0.0232, 0.0000),
    float3(0.0468, 0.0170, 0.0000), float3(0.0329, 0.0119, 0.0000), float3(0.0227, 0.0082, 0.0000),
    float3(0.0158, 0.0057, 0.0000), float3(0.0114, 0.0041, 0.0000), float3(0.0081, 0.0029, 0.0000),
    float3(0.0058, 0.0021, 0.0000), float3(0.0041, 0.0015, 0.0000), float3(0.0029, 0.0010, 0.0000),
    float3(0.0020, 0.0007, 0.0000), float3(0.0014, 0.0005, 0.0000), float3(0.0010, 0.0004, 0.0000),
    float3(0.0007, 0.0002, 0.0000), float3(0.0005, 0.0002, 0.0000), float3(0.0003, 0.0001, 0.0000),
    float3(0.0002, 0.0001, 0.0000), float3(0.0002, 0.0001, 0.0000), float3(0.0001, 0.0000, 0.0000),
    float3(0.0001, 0.0000, 0.0000), float3(0.0001, 0.0000, 0.0000), float3(0.0000, 0.0000, 0.0000)};

// Linear Rec.709 primaries with a D65 white (the shading system's default colour system): the
// float matrices the CPU derives from the chromaticities, summed in its order.
float3 XYZ_to_rgb(float3 c) {
    precise float3 rgb = c.x * float3(3.24297929, -0.968997717, 0.0556683466) +
                         c.y * float3(-1.5383364, 1.87549162, -0.204117149) +
                         c.z * float3(-0.498919934, 0.041544538, 1.05769825);
    return rgb;
}

float3 rgb_to_XYZ(float3 c) {
    precise float3 xyz = c.x * float3(0.412135273, 0.212507233, 0.0193188228) +
                         c.y * float3(0.357675076, 0.715350151, 0.119224966) +
                         c.z * float3(0.180356786, 0.0721427053, 0.94987905);
    return xyz;
}

// The colour of one wavelength in nanometres, scaled so that no component exceeds 1.
float3 wavelength_color(float lambda_nm) {
    precise float position = (lambda_nm - 380.0) / 5.0;
    int i = (int)position;
    // Truncation toward zero, as on the CPU: just below 380 nm extrapolates the first step.
    if (i < 0 || i >= 80)
        return float3(0.0, 0.0, 0.0);
    precise float f = position - (float)i;
    precise float3 xyz = ksg_cie_cmf[i] * (1.0 - f) + ksg_cie_cmf[i + 1] * f;
    return max(XYZ_to_rgb(xyz) * (1.0 / 2.52), 0.0);
}

// Spectral exitance of a black body (Planck's law), wavelength in nm, per metre of wavelength.
float ksg_planck(float nm, float kelvin) {
    precise float m = nm * 1e-9;
    precise float m2 = m * m;
    precise float m5 = m2 * m2 * m;
    precise float e = (3.74183e-16 * (1.0 / m5)) / fast_expm1(1.4388e-2 / (m * kelvin));
    return e;
}

// Planck's law integrated against the colour matching functions in 5 nm steps.
float3 ksg_blackbody_xyz(float kelvin) {
    precise float3 xyz = float3(0.0, 0.0, 0.0);
    [loop] for (int i = 0; i < 81; ++i) {
        precise float e = ksg_planck(380.0 + 5.0 * (float)i, kelvin) * 5e-9;
        xyz += e * ksg_cie_cmf[i];
    }
    return xyz;
}

// The CPU shading system interpolates blackbody colours between 317 temperatures from 800K to
// 12000K (T = 2 i^1.5 + 800) in their fifth roots. The viewport integrates the two it needs.
float3 ksg_blackbody_root(float i) {
    precise float r = sqrt(i);
    precise float kelvin = r * r * r * 2.0 + 800.0;
    return pow(max(XYZ_to_rgb(ksg_blackbody_xyz(kelvin)), 0.0), 0.2);
}

// The CPU shading system's cube root: a bit-level guess and two Newton steps.
float ksg_fast_cbrt(float x) {
    float x0 = abs(x);
    precise float a = asfloat(0x2a5137a0 + asint(x0) / 3);
    a = 0.333333333 * (2.0 * a + x0 / (a * a));
    a = 0.333333333 * (2.0 * a + x0 / (a * a));
    return ksg_copysign(x0 == 0.0 ? 0.0 : a, x);
}

// The colour of a black body at temperature T in Kelvin.
float3 blackbody_rgb(float T) {
    if (T < 800.0)
        return float3(1.0e-6, 0.0, 0.0);
    if (T < 12000.0) {
        precise float c = ksg_fast_cbrt((T - 800.0) / 2.0);
        precise float t = c * c;
        int i = min((int)t, 315);
        precise float f = t - (float)i;
        precise float3 root = ksg_blackbody_root((float)i) * (1.0 - f) +
                              ksg_blackbody_root((float)(i + 1)) * f;
        precise float3 r2 = root * root;
        precise float3 rgb = r2 * r2 * root;
        return rgb;
    }
    return max(XYZ_to_rgb(ksg_blackbody_xyz(T)), 0.0);
}

float3 hsv_to_rgb(float3 hsv) {
    float h = hsv.x, s = hsv.y, v = hsv.z;
    if (s < 0.0001)
        return float3(v, v, v);
    h = 6.0 * (h - floor(h));
    int hi = (int)floor(h);
    float f = h - (float)hi;
    float p = v * (1.0 - s);
    float q = v * (1.0 - s * f);
    float t = v * (1.0 - s * (1.0 - f));
    if (hi == 0)
        return float3(v, t, p);
    if (hi == 1)
        return float3(q, v, p);
    if (hi == 2)
        return float3(p, v, t);
    if (hi == 3)
        return float3(p, q, v);
    if (hi == 4)
        return float3(t, p, v);
    return float3(v, p, q);
}

float3 rgb_to_hsv(float3 rgb) {
    float lo = min(rgb.x, min(rgb.y, rgb.z));
    float hi = max(rgb.x, max(rgb.y, rgb.z));
    float chroma = hi - lo;
    float s = hi > 0.0 ? chroma / hi : 0.0;
    float h = 0.0;
    if (s > 0.0) {
        // The sector's offset and the 1/6 scale folded into one division, as on the CPU.
        precise float turn;
        if (rgb.x >= hi)
            turn = (rgb.y - rgb.z) / (6.0 * chroma);
        else if (rgb.y >= hi)
            turn = 2.0 / 6.0 + (rgb.z - rgb.x) / (6.0 * chroma);
        else
            turn = 4.0 / 6.0 + (rgb.x - rgb.y) / (6.0 * chroma);
        h = turn;
        if (h < 0.0)
            h += 1.0;
    }
    return float3(h, s, hi);
}

float3 hsl_to_rgb(float3 hsl) {
    float h = hsl.x, s = hsl.y, l = hsl.z;
    float v = l <= 0.5 ? l * (1.0 + s) : l * (1.0 - s) + s;
    if (v <= 0.0)
        return float3(0.0, 0.0, 0.0);
    float lo = 2.0 * l - v;
    return hsv_to_rgb(float3(h, (v - lo) / v, v));
}

float3 rgb_to_hsl(float3 rgb) {
    float lo = min(rgb.x, min(rgb.y, rgb.z));
    float3 hsv = rgb_to_hsv(rgb);
    float hi = hsv.z;
    float l = (lo + hi) * 0.5;
    float s = 0.0;
    if (lo != hi)
        s = l <= 0.5 ? (hi - lo) / (hi + lo) : (hi - lo) / (2.0 - hi - lo);
    return float3(hsv.x, s, l);
}

float3 YIQ_to_rgb(float3 yiq) {
    precise float3 rgb = yiq.x * float3(1.0000, 1.0000, 1.0000) +
                         yiq.y * float3(0.9557, -0.2716, -1.1082) +
                         yiq.z * float3(0.6199, -0.6469, 1.7051);
    return rgb;
}

float3 rgb_to_YIQ(float3 rgb) {
    precise float3 yiq = rgb.x * float3(0.299, 0.596, 0.212) +
                         rgb.y * float3(0.587, -0.275, -0.523) +
                         rgb.z * float3(0.114, -0.321, 0.311);
    return yiq;
}
