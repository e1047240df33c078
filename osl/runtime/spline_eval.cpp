// Spline bases as 4x4 matrices applied to four consecutive knots per segment, evaluated as a
// cubic in the segment-local parameter; the inverse finds the parameter by regula falsi.
#include "spline_eval.h"

#include <cmath>

namespace OSL {

namespace {

using D2 = Dual2<float>;

struct BasisMatrix {
    int step;
    float m[4][4];
};

// Row k gives the coefficient of x^(3-k) as a combination of the segment's four knots.
constexpr BasisMatrix kBases[] = {
    // catmull-rom
    {1,
     {{-1.0f / 2.0f, 3.0f / 2.0f, -3.0f / 2.0f, 1.0f / 2.0f},
      {2.0f / 2.0f, -5.0f / 2.0f, 4.0f / 2.0f, -1.0f / 2.0f},
      {-1.0f / 2.0f, 0.0f / 2.0f, 1.0f / 2.0f, 0.0f / 2.0f},
      {0.0f / 2.0f, 2.0f / 2.0f, 0.0f / 2.0f, 0.0f / 2.0f}}},
    // bezier
    {3, {{-1, 3, -3, 1}, {3, -6, 3, 0}, {-3, 3, 0, 0}, {1, 0, 0, 0}}},
    // bspline
    {1,
     {{-1.0f / 6.0f, 3.0f / 6.0f, -3.0f / 6.0f, 1.0f / 6.0f},
      {3.0f / 6.0f, -6.0f / 6.0f, 3.0f / 6.0f, 0.0f / 6.0f},
      {-3.0f / 6.0f, 0.0f / 6.0f, 3.0f / 6.0f, 0.0f / 6.0f},
      {1.0f / 6.0f, 4.0f / 6.0f, 1.0f / 6.0f, 0.0f / 6.0f}}},
    // hermite: value, tangent, value, tangent
    {2, {{2, 1, -2, 1}, {-3, -2, 3, -1}, {0, 1, 0, 0}, {1, 0, 0, 0}}},
    // linear
    {1, {{0, 0, 0, 0}, {0, 0, 0, 0}, {0, -1, 1, 0}, {0, 1, 0, 0}}},
    // constant (evaluated separately)
    {1, {{0, 0, 0, 0}, {0, 0, 0, 0}, {0, 0, 0, 0}, {0, 0, 0, 0}}},
};

const BasisMatrix& basisMatrix(SplineBasis b) {
    return kBases[static_cast<int>(b)];
}

int segmentCount(SplineBasis b, int count) {
    return (count - 4) / basisMatrix(b).step + 1;
}

// Clamps to [lo, hi] by value; a value inside keeps its derivatives, a clamped one has none.
D2 clampDual(const D2& x, float lo, float hi) {
    if (!(x.val() >= lo)) return D2(lo);
    if (!(x.val() <= hi)) return D2(hi);
    return x;
}

// The float spline at x, for the inverse search.
D2 evalFloatSpline(SplineBasis basis, const D2& x, const float* knots, int count) {
    SplineKnots k;
    k.values = knots;
    k.count = count;
    D2 r;
    evalSpline(basis, x, k, &r);
    return r;
}

// Regula falsi on [xmin, xmax], falling back to bisection for the last quarter of the
// iterations; `bracketed` tells whether the interval's ends straddle y at all.
D2 solveSegment(SplineBasis basis, const D2& y, D2 xmin, D2 xmax, const float* knots, int count,
                bool& bracketed) {
    constexpr int kMaxIters = 32;
    constexpr int kRegulaFalsiIters = (3 * kMaxIters) / 4;
    constexpr float kEps = 1.0e-6f;
    D2 v0 = evalFloatSpline(basis, xmin, knots, count);
    D2 v1 = evalFloatSpline(basis, xmax, knots, count);
    D2 x = xmin;
    const bool increasing = v0.val() < v1.val();
    const float vmin = increasing ? v0.val() : v1.val();
    const float vmax = increasing ? v1.val() : v0.val();
    bracketed = y.val() >= vmin && y.val() <= vmax;
    if (!bracketed) return ((y.val() < vmin) == increasing) ? xmin : xmax;
    if (std::fabs(v0.val() - v1.val()) < kEps) return x;
    for (int iter = 0; iter < kMaxIters; ++iter) {
        D2 t(0.5f);
        if (iter < kRegulaFalsiIters) {
            t = (y - v0) / (v1 - v0);
            if (t.val() <= 0.0f || t.val() >= 1.0f) t = D2(0.5f);
        }
        x = xmin * (D2(1.0f) - t) + xmax * t;
        const D2 v = evalFloatSpline(basis, x, knots, count);
        if ((v.val() < y.val()) == increasing) {
            xmin = x;
            v0 = v;
        } else {
            xmax = x;
            v1 = v;
        }
        if (std::fabs(xmax.val() - xmin.val()) < kEps || std::fabs(v.val() - y.val()) < kEps)
            return x;
    }
    return x;
}

} // namespace

SplineBasis splineBasisFromName(std::string_view name) {
    if (name == "catmull-rom") return SplineBasis::CatmullRom;
    if (name == "bezier") return SplineBasis::Bezier;
    if (name == "bspline") return SplineBasis::BSpline;
    if (name == "hermite") return SplineBasis::Hermite;
    if (name == "constant") return SplineBasis::Constant;
    return SplineBasis::Linear;
}

int splineBasisStep(SplineBasis basis) {
    return basisMatrix(basis).step;
}

void evalSpline(SplineBasis basis, const Dual2<float>& xin, const SplineKnots& knots,
                Dual2<float>* out) {
    const int nsegs = segmentCount(basis, knots.count);
    D2 x = clampDual(xin, 0.0f, 1.0f) * float(nsegs);
    int seg = int(x.val());
    if (seg < 0) seg = 0;
    if (seg > nsegs - 1) seg = nsegs - 1;
    const int nc = knots.ncomp;
    if (basis == SplineBasis::Constant) {
        for (int c = 0; c < nc; ++c) out[c] = D2(knots.values[(seg + 1) * nc + c]);
        return;
    }
    x = x - D2(float(seg));
    const BasisMatrix& b = basisMatrix(basis);
    const int first = seg * b.step;
    for (int c = 0; c < nc; ++c) {
        D2 p[4];
        for (int k = 0; k < 4; ++k) {
            const int i = (first + k) * nc + c;
            p[k] =
                D2(knots.values[i], knots.dx ? knots.dx[i] : 0.0f, knots.dy ? knots.dy[i] : 0.0f);
        }
        D2 coef[4];
        for (int k = 0; k < 4; ++k)
            coef[k] = b.m[k][0] * p[0] + b.m[k][1] * p[1] + b.m[k][2] * p[2] + b.m[k][3] * p[3];
        D2 r = coef[0] * x + coef[1];
        r = r * x + coef[2];
        r = r * x + coef[3];
        out[c] = r;
    }
}

Dual2<float> invertSpline(SplineBasis basis, const Dual2<float>& y, const float* knots, int count) {
    const int step = splineBasisStep(basis);
    const int low = step == 1 ? 1 : 0;
    const int high = step == 1 ? count - 2 : count - 1;
    const bool increasing = knots[1] < knots[count - 2];
    if (increasing) {
        if (y.val() <= knots[low]) return D2(0.0f);
        if (y.val() >= knots[high]) return D2(1.0f);
    } else {
        if (y.val() >= knots[low]) return D2(0.0f);
        if (y.val() <= knots[high]) return D2(1.0f);
    }
    // Monotonic knots can still give a curve that doubles back inside a segment, so each
    // segment is searched on its own and the first that brackets y wins.
    const int nsegs = segmentCount(basis, count);
    const float segInv = 1.0f / float(nsegs);
    D2 r0(0.0f);
    D2 x(0.0f);
    for (int s = 0; s < nsegs; ++s) {
        const D2 r1(segInv * float(s + 1));
        bool bracketed = false;
        x = solveSegment(basis, y, r0, r1, knots, count, bracketed);
        if (bracketed) return x;
        r0 = r1;
    }
    return x;
}

} // namespace OSL
