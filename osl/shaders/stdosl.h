// The OSL standard library as the Tessel compiler sees it. A function declared here without a
// body is built in: a call becomes an op of the same name (or the name given by its "op"
// metadata). A trailing `...` accepts any further arguments (options, format values).
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

OSL_UNARY(radians) OSL_UNARY(degrees) OSL_UNARY(cos) OSL_UNARY(sin) OSL_UNARY(tan)
OSL_UNARY(acos) OSL_UNARY(asin) OSL_UNARY(atan) OSL_UNARY(cosh) OSL_UNARY(sinh) OSL_UNARY(tanh)
OSL_UNARY(exp) OSL_UNARY(exp2) OSL_UNARY(expm1) OSL_UNARY(log) OSL_UNARY(log2) OSL_UNARY(log10)
OSL_UNARY(logb) OSL_UNARY(sqrt) OSL_UNARY(inversesqrt) OSL_UNARY(cbrt) OSL_UNARY(abs)
OSL_UNARY(fabs) OSL_UNARY(sign) OSL_UNARY(floor) OSL_UNARY(ceil) OSL_UNARY(round) OSL_UNARY(trunc)
OSL_UNARY(erf) OSL_UNARY(erfc)
OSL_BINARY(atan2) OSL_BINARY(pow) OSL_BINARY(fmod) OSL_BINARY(mod) OSL_BINARY(min) OSL_BINARY(max)
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
color mod(color a, float b);
point mod(point a, float b);
vector mod(vector a, float b);
normal mod(normal a, float b);
float log(float x, float b);
color log(color x, float b);
float hypot(float a, float b);
float hypot(float a, float b, float c);
int isnan(float x);
int isinf(float x);
int isfinite(float x);
void sincos(float x, output float s, output float c);
void sincos(color x, output color s, output color c);
void sincos(point x, output point s, output point c);
void sincos(vector x, output vector s, output vector c);
void sincos(normal x, output normal s, output normal c);

#define OSL_CLAMPMIX(T) T clamp(T x, T lo, T hi); T mix(T x, T y, T a); T select(T x, T y, T c); \
    T linearstep(T e0, T e1, T x); T smoothstep(T e0, T e1, T x); T smooth_linearstep(T e0, T e1, T x, T eps);
OSL_CLAMPMIX(float) OSL_CLAMPMIX(color) OSL_CLAMPMIX(point) OSL_CLAMPMIX(vector) OSL_CLAMPMIX(normal)
int clamp(int x, int lo, int hi);
int select(int x, int y, int c);
color mix(color x, color y, float a);
point mix(point x, point y, float a);
vector mix(vector x, vector y, float a);
normal mix(normal x, normal y, float a);
color clamp(color x, float lo, float hi);
point clamp(point x, float lo, float hi);
vector clamp(vector x, float lo, float hi);
normal clamp(normal x, float lo, float hi);
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
float distance(point a, point b, point q);
vector normalize(vector v);
normal normalize(normal v);
vector faceforward(vector N, vector I, vector Nref);
vector faceforward(vector N, vector I);
normal faceforward(normal N, vector I, vector Nref);
normal faceforward(normal N, vector I);
vector reflect(vector I, vector N);
vector refract(vector I, vector N, float eta);
void fresnel(vector I, normal N, float eta, output float Kr, output float Kt, output vector R,
             output vector T);
void fresnel(vector I, normal N, float eta, output float Kr, output float Kt);
point rotate(point p, float angle, point a, point b);
point rotate(point p, float angle, vector axis);
float area(point p);
vector calculatenormal(point p);
float filterwidth(float x);
vector filterwidth(point x);
vector filterwidth(vector x);
#define OSL_DERIV(T) T Dx(T x); T Dy(T x); T Dz(T x);
OSL_DERIV(float) OSL_DERIV(color) OSL_DERIV(point) OSL_DERIV(vector) OSL_DERIV(normal)
float aastep(float edge, float s);
float aastep(float edge, float s, float fw);
float aastep(float edge, float s, float dedge, float ds);

point transform(string to, point p);
point transform(string from, string to, point p);
point transform(matrix m, point p);
vector transform(string to, vector p) [[ string op = "transformv" ]];
vector transform(string from, string to, vector p) [[ string op = "transformv" ]];
vector transform(matrix m, vector p) [[ string op = "transformv" ]];
normal transform(string to, normal p) [[ string op = "transformn" ]];
normal transform(string from, string to, normal p) [[ string op = "transformn" ]];
normal transform(matrix m, normal p) [[ string op = "transformn" ]];
float transformu(string to, float x);
float transformu(string from, string to, float x);
color transformc(string to, color c);
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
OSL_CLOSURE(ward) OSL_CLOSURE(microfacet) OSL_CLOSURE(reflection) OSL_CLOSURE(refraction)
OSL_CLOSURE(transparent) OSL_CLOSURE(debug) OSL_CLOSURE(holdout) OSL_CLOSURE(background)
OSL_CLOSURE(emission) OSL_CLOSURE(subsurface) OSL_CLOSURE(oren_nayar_diffuse_bsdf)
OSL_CLOSURE(burley_diffuse_bsdf) OSL_CLOSURE(dielectric_bsdf) OSL_CLOSURE(conductor_bsdf)
OSL_CLOSURE(generalized_schlick_bsdf) OSL_CLOSURE(translucent_bsdf) OSL_CLOSURE(transparent_bsdf)
OSL_CLOSURE(subsurface_bssrdf) OSL_CLOSURE(sheen_bsdf) OSL_CLOSURE(uniform_edf)
OSL_CLOSURE(anisotropic_vdf) OSL_CLOSURE(medium_vdf) OSL_CLOSURE(layer)

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
