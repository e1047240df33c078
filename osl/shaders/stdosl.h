// The OSL standard library as the Tessel compiler sees it. A function declared here without a
// body is built in: a call becomes an op of the same name (or the name given by its "op"
// metadata). A trailing `...` accepts any further arguments (options, format values). Functions
// with a body are ordinary OSL, inlined at each call after a `functioncall` op, exactly like the
// reference library, so that compiled shaders only use ops every OSL runtime provides.
#ifndef STDOSL_H
#define STDOSL_H

#define M_PI       3.1415926535897932
#define M_PI_2     1.5707963267948966
#define M_PI_4     0.7853981633974483
#define M_2_PI     0.6366197723675813
#define M_2PI      6.2831853071795865
#define M_4PI      12.566370614359172
#define M_2_SQRTPI 1.1283791670955126
#define M_E        2.7182818284590452
#define M_LN2      0.6931471805599453
#define M_LN10     2.3025850929940457
#define M_LOG2E    1.4426950408889634
#define M_LOG10E   0.4342944819032518
#define M_SQRT2    1.4142135623730950
#define M_SQRT1_2  0.7071067811865475

#define OSL_TRIPLES(X) X(color) X(point) X(vector) X(normal)
#define OSL_FLOATS(X) X(float) OSL_TRIPLES(X)

// One-argument functions applied per component.
#define OSL_UNARY_T(T, name) T name(T x);
#define OSL_UNARY(name) OSL_UNARY_T(float, name) OSL_UNARY_T(color, name) \
    OSL_UNARY_T(point, name) OSL_UNARY_T(vector, name) OSL_UNARY_T(normal, name)
#define OSL_BINARY(name) float name(float a, float b); color name(color a, color b); \
    point name(point a, point b); vector name(vector a, vector b); normal name(normal a, normal b);

OSL_UNARY(cos) OSL_UNARY(sin) OSL_UNARY(tan)
OSL_UNARY(acos) OSL_UNARY(asin) OSL_UNARY(atan) OSL_UNARY(cosh) OSL_UNARY(sinh) OSL_UNARY(tanh)
OSL_UNARY(exp) OSL_UNARY(exp2) OSL_UNARY(expm1) OSL_UNARY(log) OSL_UNARY(log2) OSL_UNARY(log10)
OSL_UNARY(logb) OSL_UNARY(sqrt) OSL_UNARY(inversesqrt) OSL_UNARY(cbrt) OSL_UNARY(abs)
OSL_UNARY(fabs) OSL_UNARY(sign) OSL_UNARY(floor) OSL_UNARY(ceil) OSL_UNARY(round) OSL_UNARY(trunc)
OSL_UNARY(erf) OSL_UNARY(erfc)
OSL_BINARY(atan2) OSL_BINARY(pow) OSL_BINARY(fmod) OSL_BINARY(min) OSL_BINARY(max)
OSL_BINARY(step)
int abs(int x);
int fabs(int x);
int sign(int x);
int min(int a, int b);
int max(int a, int b);
int mod(int a, int b);
color pow(color x, float y);
point pow(point x, float y);
vector pow(vector x, float y);
normal pow(normal x, float y);
color fmod(color a, float b);
point fmod(point a, float b);
vector fmod(vector a, float b);
normal fmod(normal a, float b);
int isnan(float x);
int isinf(float x);
int isfinite(float x);
void sincos(float x, output float s, output float c);
void sincos(color x, output color s, output color c);
void sincos(point x, output point s, output point c);
void sincos(vector x, output vector s, output vector c);
void sincos(normal x, output normal s, output normal c);

#define OSL_CLAMPMIX(T) T mix(T x, T y, T a); T select(T x, T y, T c);
OSL_CLAMPMIX(float) OSL_CLAMPMIX(color) OSL_CLAMPMIX(point) OSL_CLAMPMIX(vector) OSL_CLAMPMIX(normal)
float smoothstep(float e0, float e1, float x);
int select(int x, int y, int c);
color mix(color x, color y, float a);
point mix(point x, point y, float a);
vector mix(vector x, vector y, float a);
normal mix(normal x, normal y, float a);
float select(float x, float y, int c);
color select(color x, color y, int c);
point select(point x, point y, int c);
vector select(vector x, vector y, int c);
normal select(normal x, normal y, int c);
color select(color x, color y, float c);
point select(point x, point y, float c);
vector select(vector x, vector y, float c);
normal select(normal x, normal y, float c);

// Geometry
float dot(vector a, vector b);
vector cross(vector a, vector b);
float length(vector v);
float length(normal v);
float distance(point a, point b);
vector normalize(vector v);
normal normalize(normal v);
float area(point p);
vector calculatenormal(point p);
float filterwidth(float x);
vector filterwidth(point x);
vector filterwidth(vector x);
#define OSL_DERIV(T) T Dx(T x); T Dy(T x); T Dz(T x);
OSL_DERIV(float) OSL_DERIV(color) OSL_DERIV(vector) OSL_DERIV(normal)
// The change of a position is a direction.
vector Dx(point p);
vector Dy(point p);
vector Dz(point p);

point transform(string from, string to, point p);
point transform(matrix m, point p);
vector transform(string from, string to, vector p) [[ string op = "transformv" ]];
vector transform(matrix m, vector p) [[ string op = "transformv" ]];
normal transform(string from, string to, normal p) [[ string op = "transformn" ]];
normal transform(matrix m, normal p) [[ string op = "transformn" ]];
float transformu(string to, float x);
float transformu(string from, string to, float x);
color transformc(string from, string to, color c);
float determinant(matrix m);
matrix transpose(matrix m);
int getmatrix(string from, string to, output matrix m);

// Color
float luminance(color c);
color blackbody(float temperature);
color wavelength_color(float lambda);

// Noise
#define OSL_NOISE_T(name, T) T name(float x); T name(float x, float y); T name(point p); \
    T name(point p, float t); T name(string type, ...);
#define OSL_NOISE(name) OSL_NOISE_T(name, float) OSL_NOISE_T(name, color) \
    OSL_NOISE_T(name, point) OSL_NOISE_T(name, vector)
#define OSL_PNOISE_T(name, T) T name(float x, float px); T name(float x, float y, float px, float py); \
    T name(point p, point pp); T name(point p, float t, point pp, float pt); T name(string type, ...);
#define OSL_PNOISE(name) OSL_PNOISE_T(name, float) OSL_PNOISE_T(name, color) \
    OSL_PNOISE_T(name, point) OSL_PNOISE_T(name, vector)
OSL_NOISE(noise) OSL_NOISE(snoise) OSL_NOISE(cellnoise) OSL_NOISE(hashnoise)
OSL_PNOISE(pnoise) OSL_PNOISE(psnoise)
int hash(int x);
int hash(float x);
int hash(float x, float y);
int hash(point p);
int hash(point p, float t);
int hash(string s);

// Splines
#define OSL_SPLINE(T) T spline(string basis, float x, T knots[]); \
    T spline(string basis, float x, int nknots, T knots[]);
OSL_SPLINE(float) OSL_SPLINE(color) OSL_SPLINE(point) OSL_SPLINE(vector) OSL_SPLINE(normal)
float splineinverse(string basis, float y, float knots[]);
float splineinverse(string basis, float y, int nknots, float knots[]);

// Strings
void printf(string fmt, ...);
void fprintf(string filename, string fmt, ...);
void error(string fmt, ...);
void warning(string fmt, ...);
string format(string fmt, ...);
string concat(...);
int strlen(string s);
int startswith(string s, string prefix);
int endswith(string s, string suffix);
int stoi(string s);
float stof(string s);
string substr(string s, int start, int len);
string substr(string s, int start);
int getchar(string s, int n);
int split(string str, output string results[], string sep, int maxsplit);
int split(string str, output string results[], string sep);
int split(string str, output string results[]);
int regex_search(string subject, string re);
int regex_search(string subject, output int results[], string re);
int regex_match(string subject, string re);
int regex_match(string subject, output int results[], string re);

// Textures
float texture(string name, float s, float t, ...);
color texture(string name, float s, float t, ...);
float texture3d(string name, point p, ...);
color texture3d(string name, point p, ...);
float environment(string name, vector R, ...);
color environment(string name, vector R, ...);

// Values of any type written through an output argument: getattribute and friends.
#define OSL_QUERY_T(T) \
    int getattribute(string name, output T value); \
    int getattribute(string object, string name, output T value); \
    int getattribute(string name, int index, output T value); \
    int getattribute(string object, string name, int index, output T value); \
    int getattribute(string name, output T value[]); \
    int getattribute(string object, string name, output T value[]); \
    int gettextureinfo(string file, string dataname, output T value); \
    int gettextureinfo(string file, string dataname, output T value[]); \
    int gettextureinfo(string file, float s, float t, string dataname, output T value); \
    int gettextureinfo(string file, float s, float t, string dataname, output T value[]); \
    int getmessage(string name, output T value); \
    int getmessage(string source, string name, output T value); \
    int getmessage(string name, output T value[]); \
    int getmessage(string source, string name, output T value[]); \
    void setmessage(string name, T value); \
    void setmessage(string name, T value[]); \
    int dict_value(int node, string attribname, output T value); \
    int pointcloud_get(string file, int indices[], int count, string attr, output T data[]); \
    int arraylength(T a[]); \
    int isconnected(T x); \
    int isconstant(T x);
OSL_QUERY_T(int) OSL_QUERY_T(float) OSL_QUERY_T(string) OSL_QUERY_T(color) OSL_QUERY_T(point)
OSL_QUERY_T(vector) OSL_QUERY_T(normal) OSL_QUERY_T(matrix)
int isconnected(closure color x);
void setmessage(string name, closure color value);
void setmessage(string name, closure color value[]);
int getmessage(string name, output closure color value);
int getmessage(string source, string name, output closure color value);
int getmessage(string name, output closure color value[]);
int getmessage(string source, string name, output closure color value[]);
int arraylength(closure color a[]);
int isconstant(closure color x);
int dict_find(string dictionary, string query);
int dict_find(int node, string query);
int dict_next(int node);
int pointcloud_search(string file, point center, float radius, int maxpoints, ...);
int pointcloud_write(string file, point pos, ...);
int trace(point pos, vector dir, ...);
int raytype(string name);
int backfacing();
float surfacearea();
void exit();

// Closures: a call becomes a `closure` op naming the closure.
#define OSL_CLOSURE(name) closure color name(...) [[ int builtin_closure = 1 ]];
OSL_CLOSURE(diffuse) OSL_CLOSURE(oren_nayar) OSL_CLOSURE(translucent) OSL_CLOSURE(phong)
OSL_CLOSURE(ward) OSL_CLOSURE(refraction)
OSL_CLOSURE(transparent) OSL_CLOSURE(debug) OSL_CLOSURE(holdout) OSL_CLOSURE(background)
OSL_CLOSURE(emission) OSL_CLOSURE(subsurface) OSL_CLOSURE(oren_nayar_diffuse_bsdf)
OSL_CLOSURE(burley_diffuse_bsdf) OSL_CLOSURE(dielectric_bsdf) OSL_CLOSURE(conductor_bsdf)
OSL_CLOSURE(generalized_schlick_bsdf) OSL_CLOSURE(translucent_bsdf) OSL_CLOSURE(transparent_bsdf)
OSL_CLOSURE(subsurface_bssrdf) OSL_CLOSURE(sheen_bsdf) OSL_CLOSURE(uniform_edf)
OSL_CLOSURE(anisotropic_vdf) OSL_CLOSURE(medium_vdf) OSL_CLOSURE(layer)

// Closures reached through a shorter form: the short form supplies the omitted arguments.
closure color reflection(normal N, float eta, ...) [[ int builtin_closure = 1 ]];
closure color microfacet(string distribution, normal N, vector U, float xalpha, float yalpha,
                         float eta, int refr, ...) [[ int builtin_closure = 1 ]];
closure color reflection(normal N) { return reflection(N, 0.0); }
closure color microfacet(string distribution, normal N, float alpha, float eta, int refr)
{
    return microfacet(distribution, N, vector(0.0, 0.0, 0.0), alpha, alpha, eta, refr);
}

// ---------------------------------------------------------------------------------------------
// Library functions written in OSL. Triples are handled a component at a time where the
// function is defined per component.

#define OSL_DEG_PER_RAD (180.0 / M_PI)
#define OSL_RAD_PER_DEG (M_PI / 180.0)
#define OSL_ANGLES(T) \
    T degrees(T rad) { return rad * OSL_DEG_PER_RAD; } \
    T radians(T deg) { return deg * OSL_RAD_PER_DEG; }
OSL_FLOATS(OSL_ANGLES)

float hypot(float a, float b) { return sqrt(a * a + b * b); }
float hypot(float a, float b, float c) { return sqrt(a * a + b * b + c * c); }

// The logarithm to any base, through the natural one.
#define OSL_LOGB(T) T log(T x, float base) { return log(x) / log(base); }
OSL_FLOATS(OSL_LOGB)

// Remainder that takes the sign of the divisor: a - b*floor(a/b).
#define OSL_MOD(T) \
    T mod(T a, T b) { return a - b * floor(a / b); }
OSL_FLOATS(OSL_MOD)
#define OSL_MODF(T) \
    T mod(T a, float b) { return a - b * floor(a / b); }
OSL_TRIPLES(OSL_MODF)

#define OSL_CLAMP(T) T clamp(T x, T lo, T hi) { return max(min(x, hi), lo); }
OSL_FLOATS(OSL_CLAMP)
int clamp(int x, int lo, int hi) { return max(min(x, hi), lo); }

float sqr(float x) { return x * x; }

// A step widened into a linear ramp from e0 to e1; a plain step where the two meet.
float linearstep(float e0, float e1, float x)
{
    float ramp;
    if (e0 != e1) {
        float inside = clamp(x, e0, e1);
        ramp = (inside - e0) / (e1 - e0);
    } else {
        ramp = step(e0, x);
    }
    return ramp;
}

// The quadratic that rises from 0 with zero slope and reaches slope 1 after `width`.
float rampup(float x, float width) { return 0.5 / width * x * x; }

// linearstep with its corners rounded off by quadratics `eps` wide on either side.
float smooth_linearstep(float e0, float e1, float x, float eps)
{
    float ramp;
    if (e0 != e1) {
        float scale = 1.0 / (e1 - e0);
        float e = eps * scale;
        float t = (x - e0) * scale;
        if (t <= -e)
            ramp = 0;
        else if (t >= e && t <= 1.0 - e)
            ramp = t;
        else if (t >= 1.0 + e)
            ramp = 1;
        else if (t < e)
            ramp = rampup(t + e, 2.0 * e);
        else
            ramp = 1.0 - rampup(1.0 + e - t, 2.0 * e);
    } else {
        ramp = step(e0, x);
    }
    return ramp;
}

#define OSL_PERCOMP3(T, CTOR, name) \
    T name(T a, T b, T c) \
    { \
        return CTOR(name(a[0], b[0], c[0]), name(a[1], b[1], c[1]), name(a[2], b[2], c[2])); \
    }
#define OSL_PERCOMP4(T, CTOR, name) \
    T name(T a, T b, T c, T d) \
    { \
        return CTOR(name(a[0], b[0], c[0], d[0]), name(a[1], b[1], c[1], d[1]), \
                    name(a[2], b[2], c[2], d[2])); \
    }
#define OSL_STEPS(T, CTOR) OSL_PERCOMP3(T, CTOR, smoothstep) OSL_PERCOMP3(T, CTOR, linearstep) \
    OSL_PERCOMP4(T, CTOR, smooth_linearstep)
OSL_STEPS(color, color) OSL_STEPS(point, vector) OSL_STEPS(vector, vector) OSL_STEPS(normal, vector)

// Antialiased step: the step box-filtered over the combined footprint of edge and s.
float aastep(float edge, float s, float dedge, float ds)
{
    float w = fabs(dedge) + fabs(ds);
    float hw = 0.5 * w;
    float lo = edge - hw;
    return (s <= lo) ? 0.0 : ((s >= edge + hw) ? 1.0 : (s - lo) / w);
}
float aastep(float edge, float s, float ds) { return aastep(edge, s, filterwidth(edge), ds); }
float aastep(float edge, float s)
{
    return aastep(edge, s, filterwidth(edge), filterwidth(s));
}

// Distance from q to the segment a-b.
float distance(point a, point b, point q)
{
    vector ab = b - a;
    float len2 = dot(ab, ab);
    if (len2 == 0.0)
        return distance(q, a);
    float along = dot(q - a, ab) / len2;
    return distance(q, a + clamp(along, 0.0, 1.0) * ab);
}

// N turned to face against I, judged by the reference normal.
vector faceforward(vector N, vector I, vector Nref) { return (dot(I, Nref) > 0) ? -N : N; }
vector faceforward(vector N, vector I) { return faceforward(N, I, Ng); }
normal faceforward(normal N, vector I, normal Nref) { return (dot(I, Nref) > 0) ? -N : N; }
normal faceforward(normal N, vector I) { return faceforward(N, I, Ng); }

// Mirror direction of I about the unit normal N.
vector reflect(vector I, vector N) { return I - 2 * dot(N, I) * N; }

// Snell's law; a zero vector on total internal reflection.
vector refract(vector I, vector N, float eta)
{
    float cosi = dot(I, N);
    float k = 1 - eta * eta * (1 - cosi * cosi);
    return (k < 0) ? vector(0.0, 0.0, 0.0) : eta * I - N * (eta * cosi + sqrt(k));
}

// Unpolarised Fresnel reflectance of a dielectric, with the reflected and refracted directions.
void fresnel(vector I, normal N, float eta, output float Kr, output float Kt, output vector R,
             output vector T)
{
    float c = dot(I, N);
    if (c < 0)
        c = -c;
    R = reflect(I, N);
    float g = 1.0 / sqr(eta) - 1.0 + c * c;
    if (g >= 0.0) {
        g = sqrt(g);
        float gmc = g - c;
        float f = (c * (g + c) - 1.0) / (c * gmc + 1.0);
        f = 0.5 * (1.0 + sqr(f));
        f *= sqr(gmc / (g + c));
        Kr = f;
        Kt = (1.0 - Kr) * eta * eta;
        T = refract(I, N, eta);
    } else {
        Kr = 1.0;
        Kt = 0.0;
        T = vector(0.0, 0.0, 0.0);
    }
}
void fresnel(vector I, normal N, float eta, output float Kr, output float Kt)
{
    vector R, T;
    fresnel(I, N, eta, Kr, Kt, R, T);
}

// Rotation of p by `angle` radians about the line through a and b (right-handed).
point rotate(point p, float angle, point a, point b)
{
    vector axis = normalize(b - a);
    float s, c;
    sincos(angle, s, c);
    float oc = 1.0 - c;
    float x = axis[0], y = axis[1], z = axis[2];
    matrix M = matrix(x * x + (1.0 - x * x) * c, x * y * oc + z * s, x * z * oc - y * s, 0.0,
                      x * y * oc - z * s, y * y + (1.0 - y * y) * c, y * z * oc + x * s, 0.0,
                      x * z * oc + y * s, y * z * oc - x * s, z * z + (1.0 - z * z) * c, 0.0,
                      0.0, 0.0, 0.0, 1.0);
    return transform(M, p - a) + a;
}
point rotate(point p, float angle, vector axis)
{
    return rotate(p, angle, point(0.0, 0.0, 0.0), axis);
}

// Transforms from "common" space, and colours from "rgb".
point transform(string to, point p) { return transform("common", to, p); }
vector transform(string to, vector v) { return transform("common", to, v); }
normal transform(string to, normal n) { return transform("common", to, n); }
color transformc(string to, color c) { return transformc("rgb", to, c); }

#undef OSL_DEG_PER_RAD
#undef OSL_RAD_PER_DEG
#undef OSL_ANGLES
#undef OSL_LOGB
#undef OSL_MOD
#undef OSL_MODF
#undef OSL_CLAMP
#undef OSL_PERCOMP3
#undef OSL_PERCOMP4
#undef OSL_STEPS

#undef OSL_TRIPLES
#undef OSL_FLOATS
#undef OSL_UNARY_T
#undef OSL_UNARY
#undef OSL_BINARY
#undef OSL_CLAMPMIX
#undef OSL_DERIV
#undef OSL_NOISE_T
#undef OSL_NOISE
#undef OSL_PNOISE_T
#undef OSL_PNOISE
#undef OSL_SPLINE
#undef OSL_QUERY_T
#undef OSL_CLOSURE

#endif
