// Piecewise-cubic spline evaluation over uniformly spaced knots, and its inverse for monotonic
// float knots, carrying derivatives through the parameter and the knots.
#pragma once

#include <OSL/dual.h>
#include <OSL/oslconfig.h>

#include <string_view>

namespace OSL {

enum class SplineBasis { CatmullRom, Bezier, BSpline, Hermite, Linear, Constant };

// The basis of a spline name; names that are not a basis mean "linear".
SplineBasis splineBasisFromName(std::string_view name);

// Knots consumed per segment: 1, except bezier (3) and hermite (2).
int splineBasisStep(SplineBasis basis);

// Fewest knots any spline needs (one full segment).
constexpr int kMinSplineKnots = 4;

// The knots of one spline: `count` knots of `ncomp` floats each, knot k's component c at
// values[k * ncomp + c]; dx/dy hold the knots' derivatives in the same layout, or are null.
struct SplineKnots {
    const float* values = nullptr;
    const float* dx = nullptr;
    const float* dy = nullptr;
    int count = 0;
    int ncomp = 1;
};

// The spline at x (clamped to [0, 1]) into out[0 .. ncomp-1]. Needs count >= kMinSplineKnots.
// The constant basis is piecewise constant and so has no derivatives.
void evalSpline(SplineBasis basis, const Dual2<float>& x, const SplineKnots& knots,
                Dual2<float>* out);

// The x in [0, 1] at which the float spline reaches y, searching each segment in turn (so knots
// that are monotonic, ascending or descending, find their one solution); y beyond the end knots
// gives 0 or 1. Derivatives follow y's; the knots' are not used. Needs count >= kMinSplineKnots.
Dual2<float> invertSpline(SplineBasis basis, const Dual2<float>& y, const float* knots, int count);

} // namespace OSL
