// Arithmetic, comparison, logic and the float math library, component by component with
// derivatives when the result carries them.
#include "kernels_registry.h"

#include <OSL/dual.h>

#include <OpenImageIO/fmath.h>

#include <cfloat>
#include <cmath>

namespace OSL {

namespace {

using D2 = Dual2<float>;

inline D2 mk(const D2& a, float f, float df) {
    return dualfunc(a, f, df);
}

// ---- binary operators ------------------------------------------------------------------------

struct Add {
    static float v(float a, float b) { return a + b; }
    static D2 d(const D2& a, const D2& b) { return a + b; }
    static int i(int a, int b) { return a + b; }
};
struct Sub {
    static float v(float a, float b) { return a - b; }
    static D2 d(const D2& a, const D2& b) { return a - b; }
    static int i(int a, int b) { return a - b; }
};
struct Mul {
    static float v(float a, float b) { return a * b; }
    static D2 d(const D2& a, const D2& b) { return a * b; }
    static int i(int a, int b) { return a * b; }
};
// A quotient that is not a finite number (a zero divisor, or one so tiny that the quotient
// overflows) is zero; tiny divisors with a representable quotient divide normally.
struct Div {
    static float v(float a, float b) {
        const float q = a / b;
        return std::isfinite(q) ? q : 0.0f;
    }
    static D2 d(const D2& a, const D2& b) {
        return std::isfinite(a.val() / b.val()) ? a / b : D2(0.0f);
    }
    static int i(int a, int b) { return b == 0 ? 0 : a / b; }
};
struct Mod {
    static float v(float a, float b) { return b == 0.0f ? 0.0f : std::fmod(a, b); }
    static D2 d(const D2& a, const D2& b) {
        D2 r = a;
        r.val() = v(a.val(), b.val());
        return r;
    }
    static int i(int a, int b) { return b == 0 ? 0 : a % b; }
};
struct Pow {
    static float v(float x, float y) { return OIIO::fast_safe_pow(x, y); }
    static D2 d(const D2& a, const D2& b) {
        const float r = a.val() == 0.0f ? 0.0f : v(a.val(), b.val());
        const float da = b.val() * v(a.val(), b.val() - 1.0f);
        const float db = a.val() > 0.0f ? r * OIIO::fast_log(a.val()) : 0.0f;
        D2 out;
        out.val() = r;
        out.dx() = da * a.dx() + db * b.dx();
        out.dy() = da * a.dy() + db * b.dy();
        return out;
    }
};
struct Atan2 {
    static float v(float y, float x) { return OIIO::fast_atan2(y, x); }
    // The derivative terms are combined as the reference combines them (its sign included),
    // so that shaders see the same values.
    static D2 d(const D2& y, const D2& x) {
        const float denom = x.val() * x.val() + y.val() * y.val();
        D2 r;
        r.val() = v(y.val(), x.val());
        if (denom != 0.0f) {
            r.dx() = (y.val() * x.dx() - x.val() * y.dx()) / denom;
            r.dy() = (y.val() * x.dy() - x.val() * y.dy()) / denom;
        }
        return r;
    }
};
struct Min {
    static float v(float a, float b) { return a < b ? a : b; }
    static D2 d(const D2& a, const D2& b) { return a.val() > b.val() ? b : a; }
    static int i(int a, int b) { return a < b ? a : b; }
};
struct Max {
    static float v(float a, float b) { return a > b ? a : b; }
    static D2 d(const D2& a, const D2& b) { return a.val() > b.val() ? a : b; }
    static int i(int a, int b) { return a > b ? a : b; }
};
struct Step {
    static float v(float e, float x) { return x < e ? 0.0f : 1.0f; }
    static D2 d(const D2& e, const D2& x) { return D2(v(e.val(), x.val())); }
};

template <class F, bool D>
void kBin(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& A = in.args[1];
    const Operand& B = in.args[2];
    const int n = R.ncomp;
    if constexpr (D) {
        for (int c = 0; c < n; ++c) st.store(R, c, F::d(st.dual(A, c), st.dual(B, c)));
    } else {
        float* r = st.f(R);
        for (int c = 0; c < n; ++c) r[c] = F::v(st.comp(A, c), st.comp(B, c));
    }
}

template <class F>
void kBinInt(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = F::i(st.integer(in.args[1]), st.integer(in.args[2]));
}

// ---- matrices --------------------------------------------------------------------------------

Matrix44 loadMatrix(const ExecState& st, const Operand& o) {
    if (o.isMatrix) return *reinterpret_cast<const Matrix44*>(st.f(o));
    const float s = st.scalar(o);
    return Matrix44(s, 0, 0, 0, 0, s, 0, 0, 0, 0, s, 0, 0, 0, 0, s);
}

Matrix44 safeInverse(const Matrix44& m) {
    Matrix44 r = m.gjInverse(false);
    return r;
}

void kMatMul(ExecState& st, const Instr& in) {
    const Operand& A = in.args[1];
    const Operand& B = in.args[2];
    Matrix44& r = *reinterpret_cast<Matrix44*>(st.f(in.args[0]));
    if (A.isMatrix && B.isMatrix)
        r = loadMatrix(st, A) * loadMatrix(st, B);
    else {
        const Matrix44 m = A.isMatrix ? loadMatrix(st, A) : loadMatrix(st, B);
        const float s = A.isMatrix ? st.scalar(B) : st.scalar(A);
        r = m * s;
    }
}
void kMatDiv(ExecState& st, const Instr& in) {
    const Operand& A = in.args[1];
    const Operand& B = in.args[2];
    Matrix44& r = *reinterpret_cast<Matrix44*>(st.f(in.args[0]));
    if (B.isMatrix)
        r = loadMatrix(st, A) * safeInverse(loadMatrix(st, B));
    else {
        const float s = st.scalar(B);
        r = s == 0.0f ? Matrix44(0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0)
                      : loadMatrix(st, A) * (1.0f / s);
    }
}
template <bool Sub>
void kMatAddSub(ExecState& st, const Instr& in) {
    const Matrix44 a = loadMatrix(st, in.args[1]);
    const Matrix44 b = loadMatrix(st, in.args[2]);
    *reinterpret_cast<Matrix44*>(st.f(in.args[0])) = Sub ? a - b : a + b;
}
void kMatNeg(ExecState& st, const Instr& in) {
    *reinterpret_cast<Matrix44*>(st.f(in.args[0])) = -loadMatrix(st, in.args[1]);
}

// ---- unary functions ---------------------------------------------------------------------------

#define UNARY_FN(NAME, VALUE, DERIV)                                                               \
    struct NAME {                                                                                  \
        static float v(float x) { return VALUE; }                                                  \
        static D2 d(const D2& a) {                                                                 \
            const float x = a.val();                                                               \
            return mk(a, VALUE, DERIV);                                                            \
        }                                                                                          \
    };

inline float clampUnit(float x) {
    return x < -1.0f ? -1.0f : (x > 1.0f ? 1.0f : x);
}

UNARY_FN(Sin, OIIO::fast_sin(x), OIIO::fast_cos(x))
UNARY_FN(Cos, OIIO::fast_cos(x), -OIIO::fast_sin(x))
UNARY_FN(Tan, OIIO::fast_tan(x), 1.0f / (OIIO::fast_cos(x) * OIIO::fast_cos(x)))
UNARY_FN(Asin, OIIO::fast_asin(clampUnit(x)),
         (x > -1.0f && x < 1.0f) ? 1.0f / std::sqrt(1 - x * x) : 0.0f)
UNARY_FN(Acos, OIIO::fast_acos(clampUnit(x)),
         (x > -1.0f && x < 1.0f) ? -1.0f / std::sqrt(1 - x * x) : 0.0f)
UNARY_FN(Atan, OIIO::fast_atan(x), 1.0f / (1.0f + x * x))
UNARY_FN(Sinh, OIIO::fast_sinh(x), OIIO::fast_cosh(x))
UNARY_FN(Cosh, OIIO::fast_cosh(x), OIIO::fast_sinh(x))
UNARY_FN(Tanh, OIIO::fast_tanh(x), 1.0f / (OIIO::fast_cosh(x) * OIIO::fast_cosh(x)))
UNARY_FN(Exp, OIIO::fast_exp(x), OIIO::fast_exp(x))
UNARY_FN(Exp2, OIIO::fast_exp2(x), OIIO::fast_exp2(x) * float(M_LN2))
UNARY_FN(Expm1, OIIO::fast_expm1(x), OIIO::fast_exp(x))
UNARY_FN(Log, OIIO::fast_log(x), x < FLT_MIN ? 0.0f : 1.0f / x)
UNARY_FN(Log2, OIIO::fast_log2(x), x < FLT_MIN ? 0.0f : 1.0f / (x * float(M_LN2)))
UNARY_FN(Log10, OIIO::fast_log10(x), x < FLT_MIN ? 0.0f : 1.0f / (x * float(M_LN10)))
UNARY_FN(Logb, OIIO::fast_logb(x), 0.0f)
UNARY_FN(Sqrt, x <= 0.0f ? 0.0f : std::sqrt(x), x <= 0.0f ? 0.0f : 0.5f / std::sqrt(x))
UNARY_FN(InvSqrt, x <= 0.0f ? 0.0f : 1.0f / std::sqrt(x),
         x <= 0.0f ? 0.0f : -0.5f / (x * std::sqrt(x)))
UNARY_FN(Cbrt, OIIO::fast_cbrt(x),
         x == 0.0f ? 0.0f : 1.0f / (3.0f * OIIO::fast_cbrt(x) * OIIO::fast_cbrt(x)))
UNARY_FN(Abs, std::fabs(x), x >= 0.0f ? 1.0f : -1.0f)
UNARY_FN(Floor, std::floor(x), 0.0f)
UNARY_FN(Ceil, std::ceil(x), 0.0f)
UNARY_FN(Round, std::round(x), 0.0f)
UNARY_FN(Trunc, std::trunc(x), 0.0f)
UNARY_FN(Sign, x < 0.0f ? -1.0f : (x > 0.0f ? 1.0f : 0.0f), 0.0f)
UNARY_FN(Erf, OIIO::fast_erf(x), 2.0f / std::sqrt(float(M_PI)) * std::exp(-x * x))
UNARY_FN(Erfc, OIIO::fast_erfc(x), -2.0f / std::sqrt(float(M_PI)) * std::exp(-x * x))
UNARY_FN(Neg, -x, -1.0f)
UNARY_FN(Radians, x* float(M_PI / 180.0), float(M_PI / 180.0))
UNARY_FN(Degrees, x* float(180.0 / M_PI), float(180.0 / M_PI))

template <class F, bool D>
void kUn(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& A = in.args[1];
    const int n = R.ncomp;
    if constexpr (D) {
        for (int c = 0; c < n; ++c) st.store(R, c, F::d(st.dual(A, c)));
    } else {
        float* r = st.f(R);
        for (int c = 0; c < n; ++c) r[c] = F::v(st.comp(A, c));
    }
}

void kNegInt(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = -*st.i(in.args[1]);
}
void kAbsInt(ExecState& st, const Instr& in) {
    const int a = *st.i(in.args[1]);
    *st.i(in.args[0]) = a < 0 ? -a : a;
}
void kSignInt(ExecState& st, const Instr& in) {
    const int a = *st.i(in.args[1]);
    *st.i(in.args[0]) = a < 0 ? -1 : (a > 0 ? 1 : 0);
}

void kSincos(ExecState& st, const Instr& in) {
    const Operand& X = in.args[0];
    const Operand& S = in.args[1];
    const Operand& C = in.args[2];
    for (int c = 0; c < S.ncomp; ++c) {
        const D2 x = st.dual(X, c);
        st.store(S, c, Sin::d(x));
        st.store(C, c, Cos::d(x));
    }
}

// ---- ternary ---------------------------------------------------------------------------------

struct Mix {
    static D2 d(const D2& a, const D2& b, const D2& x) { return a * (D2(1.0f) - x) + b * x; }
    static float v(float a, float b, float x) { return a * (1.0f - x) + b * x; }
};
struct Clamp {
    static D2 d(const D2& x, const D2& lo, const D2& hi) {
        return x.val() < lo.val() ? lo : (x.val() > hi.val() ? hi : x);
    }
    static float v(float x, float lo, float hi) { return x < lo ? lo : (x > hi ? hi : x); }
};
struct Smoothstep {
    static D2 d(const D2& e0, const D2& e1, const D2& x) {
        if (x.val() < e0.val()) return D2(0.0f);
        if (x.val() >= e1.val()) return D2(1.0f);
        const D2 t = (x - e0) / (e1 - e0);
        return (D2(3.0f) - D2(2.0f) * t) * t * t;
    }
    static float v(float e0, float e1, float x) { return d(D2(e0), D2(e1), D2(x)).val(); }
};
struct Linearstep {
    static D2 d(const D2& e0, const D2& e1, const D2& x) {
        if (x.val() < e0.val()) return D2(0.0f);
        if (x.val() >= e1.val()) return D2(1.0f);
        return (x - e0) / (e1 - e0);
    }
    static float v(float e0, float e1, float x) { return d(D2(e0), D2(e1), D2(x)).val(); }
};
// linearstep with its corners rounded over a width of eps on each side of both edges.
struct SmoothLinearstep {
    static D2 d(const D2& e0, const D2& e1, const D2& x_, const D2& eps_) {
        if (e0.val() == e1.val()) return D2(x_.val() < e0.val() ? 0.0f : 1.0f);
        const D2 widthInv = D2(1.0f) / (e1 - e0);
        const D2 eps = eps_ * widthInv;
        const D2 x = (x_ - e0) * widthInv;
        auto rampup = [](const D2& t, const D2& r) { return D2(0.5f) / r * t * t; };
        if (x.val() <= -eps.val()) return D2(0.0f);
        if (x.val() >= eps.val() && x.val() <= 1.0f - eps.val()) return x;
        if (x.val() >= 1.0f + eps.val()) return D2(1.0f);
        if (x.val() < eps.val()) return rampup(x + eps, D2(2.0f) * eps);
        return D2(1.0f) - rampup(D2(1.0f) + eps - x, D2(2.0f) * eps);
    }
    static float v(float e0, float e1, float x, float eps) {
        return d(D2(e0), D2(e1), D2(x), D2(eps)).val();
    }
};
struct Select {
    static D2 d(const D2& a, const D2& b, const D2& c) { return c.val() != 0.0f ? b : a; }
    static float v(float a, float b, float c) { return c != 0.0f ? b : a; }
};

template <class F, bool D>
void kTer(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const int n = R.ncomp;
    if constexpr (D) {
        for (int c = 0; c < n; ++c)
            st.store(R, c,
                     F::d(st.dual(in.args[1], c), st.dual(in.args[2], c), st.dual(in.args[3], c)));
    } else {
        float* r = st.f(R);
        for (int c = 0; c < n; ++c)
            r[c] = F::v(st.comp(in.args[1], c), st.comp(in.args[2], c), st.comp(in.args[3], c));
    }
}
template <class F, bool D>
void kQuad(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const int n = R.ncomp;
    if constexpr (D) {
        for (int c = 0; c < n; ++c)
            st.store(R, c,
                     F::d(st.dual(in.args[1], c), st.dual(in.args[2], c), st.dual(in.args[3], c),
                          st.dual(in.args[4], c)));
    } else {
        float* r = st.f(R);
        for (int c = 0; c < n; ++c)
            r[c] = F::v(st.comp(in.args[1], c), st.comp(in.args[2], c), st.comp(in.args[3], c),
                        st.comp(in.args[4], c));
    }
}

struct Hypot {
    static D2 d(const D2& a, const D2& b) { return OSL::sqrt(a * a + b * b); }
    static float v(float a, float b) { return std::sqrt(a * a + b * b); }
};
struct Hypot3 {
    static D2 d(const D2& a, const D2& b, const D2& c) { return OSL::sqrt(a * a + b * b + c * c); }
    static float v(float a, float b, float c) { return std::sqrt(a * a + b * b + c * c); }
};

// log(x, base): the natural logarithms' quotient, 0 where the base's logarithm is 0.
struct LogBase {
    static D2 d(const D2& x, const D2& b) {
        const D2 lb = Log::d(b);
        if (lb.val() == 0.0f) return D2(0.0f);
        return Log::d(x) / lb;
    }
    static float v(float x, float b) {
        const float lb = Log::v(b);
        return lb == 0.0f ? 0.0f : Log::v(x) / lb;
    }
};

void kClampInt(ExecState& st, const Instr& in) {
    const int x = st.integer(in.args[1]), lo = st.integer(in.args[2]), hi = st.integer(in.args[3]);
    *st.i(in.args[0]) = x < lo ? lo : (x > hi ? hi : x);
}
void kSelectInt(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = st.integer(in.args[3]) ? st.integer(in.args[2]) : st.integer(in.args[1]);
}

// ---- comparisons and logic -------------------------------------------------------------------

bool equalValues(const ExecState& st, const Operand& a, const Operand& b) {
    if (a.isString || b.isString) return *st.s(a) == *st.s(b);
    if (a.isClosure || b.isClosure) return *st.c(a) == *st.c(b);
    if (a.isInt && b.isInt) return *st.i(a) == *st.i(b);
    if (a.isMatrix || b.isMatrix) return loadMatrix(st, a) == loadMatrix(st, b);
    const int n = std::max(a.ncomp, b.ncomp);
    for (int c = 0; c < n; ++c)
        if (st.comp(a, c) != st.comp(b, c)) return false;
    return true;
}

void kEq(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = equalValues(st, in.args[1], in.args[2]);
}
void kNeq(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = !equalValues(st, in.args[1], in.args[2]);
}
template <int Kind>
void kCompare(ExecState& st, const Instr& in) {
    const Operand& A = in.args[1];
    const Operand& B = in.args[2];
    bool r;
    if (A.isInt && B.isInt) {
        const int a = *st.i(A), b = *st.i(B);
        r = Kind == 0 ? a < b : Kind == 1 ? a > b : Kind == 2 ? a <= b : a >= b;
    } else {
        const int n = std::max(A.ncomp, B.ncomp);
        r = true;
        for (int c = 0; c < n && r; ++c) {
            const float a = st.comp(A, c), b = st.comp(B, c);
            r = Kind == 0 ? a < b : Kind == 1 ? a > b : Kind == 2 ? a <= b : a >= b;
        }
    }
    *st.i(in.args[0]) = r;
}

bool truth(const ExecState& st, const Operand& o) {
    if (o.isInt) return *st.i(o) != 0;
    if (o.isFloat) return *st.f(o) != 0.0f;
    if (o.isString) return !st.s(o)->empty();
    return *st.c(o) != nullptr;
}
void kAnd(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = truth(st, in.args[1]) && truth(st, in.args[2]);
}
void kOr(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = truth(st, in.args[1]) || truth(st, in.args[2]);
}
void kNot(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = !truth(st, in.args[1]);
}

template <int Kind>
void kBits(ExecState& st, const Instr& in) {
    const int a = *st.i(in.args[1]), b = *st.i(in.args[2]);
    *st.i(in.args[0]) = Kind == 0   ? (a & b)
                        : Kind == 1 ? (a | b)
                        : Kind == 2 ? (a ^ b)
                        : Kind == 3 ? int(unsigned(a) << (b & 31))
                                    : (a >> (b & 31));
}
void kCompl(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = ~*st.i(in.args[1]);
}

template <int Kind>
void kFloatClass(ExecState& st, const Instr& in) {
    const float x = st.scalar(in.args[1]);
    *st.i(in.args[0]) = Kind == 0 ? std::isnan(x) : Kind == 1 ? std::isinf(x) : std::isfinite(x);
}

// ---- geometry --------------------------------------------------------------------------------

D2 dotD(const ExecState& st, const Operand& a, const Operand& b) {
    D2 r(0.0f);
    for (int c = 0; c < 3; ++c) r = r + st.dual(a, c) * st.dual(b, c);
    return r;
}
void kDot(ExecState& st, const Instr& in) {
    st.store(in.args[0], 0, dotD(st, in.args[1], in.args[2]));
}
void kCross(ExecState& st, const Instr& in) {
    const Operand& A = in.args[1];
    const Operand& B = in.args[2];
    D2 a[3], b[3];
    for (int c = 0; c < 3; ++c) a[c] = st.dual(A, c), b[c] = st.dual(B, c);
    st.store(in.args[0], 0, a[1] * b[2] - a[2] * b[1]);
    st.store(in.args[0], 1, a[2] * b[0] - a[0] * b[2]);
    st.store(in.args[0], 2, a[0] * b[1] - a[1] * b[0]);
}
D2 lengthOf(const D2 v[3]) {
    D2 s = v[0] * v[0] + v[1] * v[1] + v[2] * v[2];
    return OSL::sqrt(s);
}
void kLength(ExecState& st, const Instr& in) {
    D2 v[3];
    for (int c = 0; c < 3; ++c) v[c] = st.dual(in.args[1], c);
    st.store(in.args[0], 0, lengthOf(v));
}
void kDistance(ExecState& st, const Instr& in) {
    D2 v[3];
    if (in.nargs == 4) {
        // Distance from point q to the segment a-b.
        D2 a[3], b[3], q[3];
        for (int c = 0; c < 3; ++c)
            a[c] = st.dual(in.args[1], c), b[c] = st.dual(in.args[2], c),
            q[c] = st.dual(in.args[3], c);
        D2 ab[3], aq[3];
        for (int c = 0; c < 3; ++c) ab[c] = b[c] - a[c], aq[c] = q[c] - a[c];
        const D2 len2 = ab[0] * ab[0] + ab[1] * ab[1] + ab[2] * ab[2];
        D2 t =
            len2.val() > 0.0f ? (aq[0] * ab[0] + aq[1] * ab[1] + aq[2] * ab[2]) / len2 : D2(0.0f);
        if (t.val() < 0.0f) t = D2(0.0f);
        if (t.val() > 1.0f) t = D2(1.0f);
        for (int c = 0; c < 3; ++c) v[c] = q[c] - (a[c] + ab[c] * t);
    } else {
        for (int c = 0; c < 3; ++c) v[c] = st.dual(in.args[1], c) - st.dual(in.args[2], c);
    }
    st.store(in.args[0], 0, lengthOf(v));
}
void kNormalize(ExecState& st, const Instr& in) {
    D2 v[3];
    for (int c = 0; c < 3; ++c) v[c] = st.dual(in.args[1], c);
    if (v[0].val() == 0.0f && v[1].val() == 0.0f && v[2].val() == 0.0f) {
        for (int c = 0; c < 3; ++c) st.store(in.args[0], c, D2(0.0f));
        return;
    }
    const D2 len = lengthOf(v);
    // With derivatives the components are scaled by the length's reciprocal, as the reference
    // does; its derivative rounding differs from a division's.
    if (in.args[0].derivs) {
        const D2 inv = D2(1.0f) / len;
        for (int c = 0; c < 3; ++c) st.store(in.args[0], c, v[c] * inv);
    } else {
        for (int c = 0; c < 3; ++c)
            st.store(in.args[0], c, len.val() == 0.0f ? D2(0.0f) : v[c] / len);
    }
}
// ---- selection ------------------------------------------------------------------------------

template <class F>
bool pickBinary(KernelChoice& k, bool intForm) {
    const Operand& R = k.arg(0);
    if (R.isInt) {
        if (!intForm) return k.fail("integer form not supported");
        k.in.fn = kBinInt<F>;
    } else {
        k.in.fn = R.derivs ? kBin<F, true> : kBin<F, false>;
    }
    return true;
}
template <class F>
void pickBinaryFloat(KernelChoice& k) {
    k.in.fn = k.arg(0).derivs ? kBin<F, true> : kBin<F, false>;
}
template <class F>
void pickUnary(KernelChoice& k) {
    k.in.fn = k.arg(0).derivs ? kUn<F, true> : kUn<F, false>;
}
template <class F>
void pickTernary(KernelChoice& k) {
    k.in.fn = k.arg(0).derivs ? kTer<F, true> : kTer<F, false>;
}

} // namespace

int selectMathKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const int n = k.nargs();
    auto anyMatrix = [&]() {
        for (int a = 0; a < n; ++a)
            if (k.arg(a).isMatrix) return true;
        return false;
    };
    auto anyClosure = [&]() {
        for (int a = 0; a < n; ++a)
            if (k.arg(a).isClosure) return true;
        return false;
    };
    if (n == 3 && (op == "add" || op == "sub" || op == "mul" || op == "div" || op == "mod")) {
        if (anyClosure()) return 0;
        if (anyMatrix()) {
            if (op == "mul")
                k.in.fn = kMatMul;
            else if (op == "div")
                k.in.fn = kMatDiv;
            else if (op == "add")
                k.in.fn = kMatAddSub<false>;
            else if (op == "sub")
                k.in.fn = kMatAddSub<true>;
            else
                return k.fail("mod of matrices"), -1;
            return 1;
        }
        bool ok = op == "add"   ? pickBinary<Add>(k, true)
                  : op == "sub" ? pickBinary<Sub>(k, true)
                  : op == "mul" ? pickBinary<Mul>(k, true)
                  : op == "div" ? pickBinary<Div>(k, true)
                                : pickBinary<Mod>(k, true);
        return ok ? 1 : -1;
    }
    if (op == "fmod" && n == 3) return pickBinaryFloat<Mod>(k), 1;
    if (op == "pow" && n == 3) return pickBinaryFloat<Pow>(k), 1;
    if (op == "atan2" && n == 3) return pickBinaryFloat<Atan2>(k), 1;
    if (op == "step" && n == 3) return pickBinaryFloat<Step>(k), 1;
    if ((op == "min" || op == "max") && n == 3) {
        bool ok = op == "min" ? pickBinary<Min>(k, true) : pickBinary<Max>(k, true);
        return ok ? 1 : -1;
    }
    if (op == "neg" && n == 2) {
        if (k.arg(0).isMatrix)
            k.in.fn = kMatNeg;
        else if (k.arg(0).isInt)
            k.in.fn = kNegInt;
        else
            pickUnary<Neg>(k);
        return 1;
    }
    if ((op == "abs" || op == "fabs") && n == 2) {
        if (k.arg(0).isInt)
            k.in.fn = kAbsInt;
        else
            pickUnary<Abs>(k);
        return 1;
    }
    if (op == "sign" && n == 2) {
        if (k.arg(0).isInt)
            k.in.fn = kSignInt;
        else
            pickUnary<Sign>(k);
        return 1;
    }
    if (n == 2 && k.arg(0).isFloat) {
        static const std::pair<const char*, void (*)(KernelChoice&)> unary[] = {
            {"sin", pickUnary<Sin>},        {"cos", pickUnary<Cos>},
            {"tan", pickUnary<Tan>},        {"asin", pickUnary<Asin>},
            {"acos", pickUnary<Acos>},      {"atan", pickUnary<Atan>},
            {"sinh", pickUnary<Sinh>},      {"cosh", pickUnary<Cosh>},
            {"tanh", pickUnary<Tanh>},      {"exp", pickUnary<Exp>},
            {"exp2", pickUnary<Exp2>},      {"expm1", pickUnary<Expm1>},
            {"log", pickUnary<Log>},        {"log2", pickUnary<Log2>},
            {"log10", pickUnary<Log10>},    {"logb", pickUnary<Logb>},
            {"sqrt", pickUnary<Sqrt>},      {"inversesqrt", pickUnary<InvSqrt>},
            {"cbrt", pickUnary<Cbrt>},      {"floor", pickUnary<Floor>},
            {"ceil", pickUnary<Ceil>},      {"round", pickUnary<Round>},
            {"trunc", pickUnary<Trunc>},    {"erf", pickUnary<Erf>},
            {"erfc", pickUnary<Erfc>},      {"radians", pickUnary<Radians>},
            {"degrees", pickUnary<Degrees>}};
        for (const auto& e : unary)
            if (op == e.first) return e.second(k), 1;
    }
    if (op == "log" && n == 3) return pickBinaryFloat<LogBase>(k), 1;
    if (op == "hypot" && n == 3) return pickBinaryFloat<Hypot>(k), 1;
    if (op == "hypot" && n == 4) return pickTernary<Hypot3>(k), 1;
    if (op == "smooth_linearstep" && n == 5)
        return k.in.fn =
                   k.arg(0).derivs ? kQuad<SmoothLinearstep, true> : kQuad<SmoothLinearstep, false>,
               1;
    if (op == "sincos" && n == 3) return k.in.fn = kSincos, 1;
    if (op == "mix" && n == 4) return pickTernary<Mix>(k), 1;
    if (op == "clamp" && n == 4) {
        if (k.arg(0).isInt)
            k.in.fn = kClampInt;
        else
            pickTernary<Clamp>(k);
        return 1;
    }
    if (op == "smoothstep" && n == 4) return pickTernary<Smoothstep>(k), 1;
    if (op == "linearstep" && n == 4) return pickTernary<Linearstep>(k), 1;
    if (op == "select" && n == 4) {
        if (k.arg(0).isInt)
            k.in.fn = kSelectInt;
        else
            pickTernary<Select>(k);
        return 1;
    }
    if (op == "eq" && n == 3) return k.in.fn = kEq, 1;
    if (op == "neq" && n == 3) return k.in.fn = kNeq, 1;
    if (op == "lt" && n == 3) return k.in.fn = kCompare<0>, 1;
    if (op == "gt" && n == 3) return k.in.fn = kCompare<1>, 1;
    if (op == "le" && n == 3) return k.in.fn = kCompare<2>, 1;
    if (op == "ge" && n == 3) return k.in.fn = kCompare<3>, 1;
    if (op == "and" && n == 3) return k.in.fn = kAnd, 1;
    if (op == "or" && n == 3) return k.in.fn = kOr, 1;
    if (op == "not" && n == 2) return k.in.fn = kNot, 1;
    if (op == "bitand" && n == 3) return k.in.fn = kBits<0>, 1;
    if (op == "bitor" && n == 3) return k.in.fn = kBits<1>, 1;
    if (op == "xor" && n == 3) return k.in.fn = kBits<2>, 1;
    if (op == "shl" && n == 3) return k.in.fn = kBits<3>, 1;
    if (op == "shr" && n == 3) return k.in.fn = kBits<4>, 1;
    if (op == "compl" && n == 2) return k.in.fn = kCompl, 1;
    if (op == "isnan" && n == 2) return k.in.fn = kFloatClass<0>, 1;
    if (op == "isinf" && n == 2) return k.in.fn = kFloatClass<1>, 1;
    if (op == "isfinite" && n == 2) return k.in.fn = kFloatClass<2>, 1;
    if (op == "dot" && n == 3) return k.in.fn = kDot, 1;
    if (op == "cross" && n == 3) return k.in.fn = kCross, 1;
    if (op == "length" && n == 2) return k.in.fn = kLength, 1;
    if (op == "distance" && (n == 3 || n == 4)) return k.in.fn = kDistance, 1;
    if (op == "normalize" && n == 2) return k.in.fn = kNormalize, 1;
    return 0;
}

} // namespace OSL
