// Viewport versions of OSL's error function, expm1, spectral colours and colour-space
// conversions; they follow the CPU shading system's formulas and constants.

// Abramowitz and Stegun 7.1.28; absolute error below 3e-7.
float fast_erf(float x) {
    const float a1 = 0.0705230784, a2 = 0.0422820123, a3 = 0.0092705272;
    const float a4 = 0.0001520143, a5 = 0.0002765672, a6 = 0.0000430638;
    float a = abs(x);
    float r = ((((((a6 * a + a5) * a + a4) * a + a3) * a + a2) * a + a1) * a + 1.0);
    float r2 = r * r;
    float r4 = r2 * r2;
    float r8 = r4 * r4;
    float r16 = r8 * r8;
    float e = 1.0 - 1.0 / r16;
    return x < 0.0 ? -e : e;
}

float3 fast_erf(float3 x) { return float3(fast_erf(x.x), fast_erf(x.y), fast_erf(x.z)); }

// exp(x) - 1, with its Taylor start near 0 where the difference would cancel.
float fast_expm1(float x) {
    if (abs(x) < 1e-5)
        return x + 0.5 * x * x;
    return exp(x) - 1.0;
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

// Linear Rec.709 primaries with a D65 white (the shading system's default colour system).
float3 XYZ_to_rgb(float3 c) {
    return float3(3.2429790 * c.x - 1.5383362 * c.y - 0.4989198 * c.z,
                  -0.9689980 * c.x + 1.8754920 * c.y + 0.0415445 * c.z,
                  0.0556683 * c.x - 0.2041172 * c.y + 1.0576982 * c.z);
}

float3 rgb_to_XYZ(float3 c) {
    return float3(0.4121353 * c.x + 0.3576750 * c.y + 0.1803568 * c.z,
                  0.2125073 * c.x + 0.7153500 * c.y + 0.0721427 * c.z,
                  0.0193188 * c.x + 0.1192250 * c.y + 0.9498791 * c.z);
}

// The colour of one wavelength in nanometres, scaled so that no component exceeds 1.
float3 wavelength_color(float lambda_nm) {
    float position = (lambda_nm - 380.0) / 5.0;
    int i = (int)position;
    // Truncation toward zero, as on the CPU: just below 380 nm extrapolates the first step.
    if (i < 0 || i >= 80)
        return float3(0.0, 0.0, 0.0);
    float3 xyz = lerp(ksg_cie_cmf[i], ksg_cie_cmf[i + 1], position - (float)i);
    return max(XYZ_to_rgb(xyz) * (1.0 / 2.52), 0.0);
}

// The colour of a black body at temperature T in Kelvin: Planck's law integrated against the
// colour matching functions.
float3 blackbody_rgb(float T) {
    if (T < 800.0)
        return float3(1.0e-6, 0.0, 0.0);
    float3 xyz = float3(0.0, 0.0, 0.0);
    [loop] for (int i = 0; i < 81; ++i) {
        float lambda = 380.0 + 5.0 * (float)i;
        // c1 / lambda^5 / (exp(c2 / (lambda T)) - 1) with lambda in nm, times a 5 nm step.
        float l2 = lambda * lambda;
        float emittance = 3.74183e29 / (l2 * l2 * lambda) / fast_expm1(1.4388e7 / (lambda * T));
        xyz += (emittance * 5.0e-9) * ksg_cie_cmf[i];
    }
    return max(XYZ_to_rgb(xyz), 0.0);
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
        if (rgb.x >= hi)
            h = (rgb.y - rgb.z) / chroma;
        else if (rgb.y >= hi)
            h = 2.0 + (rgb.z - rgb.x) / chroma;
        else
            h = 4.0 + (rgb.x - rgb.y) / chroma;
        h *= 1.0 / 6.0;
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
    return mul(yiq, float3x3(1.0000, 1.0000, 1.0000,
                             0.9557, -0.2716, -1.1082,
                             0.6199, -0.6469, 1.7051));
}

float3 rgb_to_YIQ(float3 rgb) {
    return mul(rgb, float3x3(0.299, 0.596, 0.212,
                             0.587, -0.275, -0.523,
                             0.114, -0.321, 0.311));
}
