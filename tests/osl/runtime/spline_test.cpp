// spline and splineinverse: values against the reference outputs of the conformance cases,
// derivatives against finite differences, and the ops' handling of bad knot counts.
#include "../../../osl/runtime/spline_eval.h"
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <fstream>
#include <string>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

using D2 = Dual2<float>;

float evalFloat(SplineBasis b, float x, const std::vector<float>& knots) {
    SplineKnots k;
    k.values = knots.data();
    k.count = int(knots.size());
    D2 r;
    evalSpline(b, D2(x), k, &r);
    return r.val();
}

TEST(SplineEval, BasisNamesAndSteps) {
    EXPECT_EQ(splineBasisFromName("catmull-rom"), SplineBasis::CatmullRom);
    EXPECT_EQ(splineBasisFromName("bezier"), SplineBasis::Bezier);
    EXPECT_EQ(splineBasisFromName("bspline"), SplineBasis::BSpline);
    EXPECT_EQ(splineBasisFromName("hermite"), SplineBasis::Hermite);
    EXPECT_EQ(splineBasisFromName("linear"), SplineBasis::Linear);
    EXPECT_EQ(splineBasisFromName("constant"), SplineBasis::Constant);
    EXPECT_EQ(splineBasisFromName("no such basis"), SplineBasis::Linear);
    EXPECT_EQ(splineBasisStep(SplineBasis::Bezier), 3);
    EXPECT_EQ(splineBasisStep(SplineBasis::Hermite), 2);
    EXPECT_EQ(splineBasisStep(SplineBasis::CatmullRom), 1);
}

TEST(SplineEval, InterpolatingBasesPassThroughTheirKnots) {
    const std::vector<float> knots = {9, 0, 1, 4, 2, 9};
    // Linear and catmull-rom run through knots 1..4 over three segments.
    for (SplineBasis b : {SplineBasis::Linear, SplineBasis::CatmullRom}) {
        EXPECT_NEAR(evalFloat(b, 0.0f, knots), 0.0f, 1e-6f);
        EXPECT_NEAR(evalFloat(b, 1.0f / 3.0f, knots), 1.0f, 1e-5f);
        EXPECT_NEAR(evalFloat(b, 2.0f / 3.0f, knots), 4.0f, 1e-5f);
        EXPECT_NEAR(evalFloat(b, 1.0f, knots), 2.0f, 1e-6f);
    }
    EXPECT_NEAR(evalFloat(SplineBasis::Linear, 1.0f / 6.0f, knots), 0.5f, 1e-5f);
    // Out-of-range parameters clamp to the ends.
    EXPECT_NEAR(evalFloat(SplineBasis::Linear, -3.0f, knots), 0.0f, 1e-6f);
    EXPECT_NEAR(evalFloat(SplineBasis::Linear, 7.0f, knots), 2.0f, 1e-6f);
    // Constant holds knot 1 + segment.
    EXPECT_EQ(evalFloat(SplineBasis::Constant, 0.1f, knots), 0.0f);
    EXPECT_EQ(evalFloat(SplineBasis::Constant, 0.5f, knots), 1.0f);
    EXPECT_EQ(evalFloat(SplineBasis::Constant, 1.0f, knots), 4.0f);
    // Bezier: end points are knots 0 and 3 of each 3-knot step.
    const std::vector<float> bez = {1, 5, -2, 3, 0, 8, 6};
    EXPECT_NEAR(evalFloat(SplineBasis::Bezier, 0.0f, bez), 1.0f, 1e-6f);
    EXPECT_NEAR(evalFloat(SplineBasis::Bezier, 0.5f, bez), 3.0f, 1e-5f);
    EXPECT_NEAR(evalFloat(SplineBasis::Bezier, 1.0f, bez), 6.0f, 1e-5f);
    // Hermite: value, tangent pairs.
    const std::vector<float> her = {2, 0, 5, 0};
    EXPECT_NEAR(evalFloat(SplineBasis::Hermite, 0.0f, her), 2.0f, 1e-6f);
    EXPECT_NEAR(evalFloat(SplineBasis::Hermite, 0.5f, her), 3.5f, 1e-5f);
    EXPECT_NEAR(evalFloat(SplineBasis::Hermite, 1.0f, her), 5.0f, 1e-5f);
}

// Derivatives through the parameter and through the knots agree with central differences,
// for every basis and for colour knots.
TEST(SplineEval, DerivativesMatchFiniteDifferences) {
    const int count = 10, nc = 3;
    std::vector<float> v(count * nc), dk(count * nc);
    for (int i = 0; i < count * nc; ++i) {
        v[i] = std::sin(0.7f * float(i)) + 0.1f * float(i % 3);
        dk[i] = std::cos(1.3f * float(i));
    }
    for (SplineBasis b : {SplineBasis::CatmullRom, SplineBasis::Bezier, SplineBasis::BSpline,
                          SplineBasis::Hermite, SplineBasis::Linear}) {
        for (float x : {0.13f, 0.41f, 0.77f}) {
            const float dxdx = 0.5f, h = 1e-3f;
            SplineKnots k;
            k.values = v.data();
            k.dx = dk.data();
            k.count = count;
            k.ncomp = nc;
            D2 r[3];
            evalSpline(b, D2(x, dxdx, 0.0f), k, r);
            // Moving along screen x by t moves the parameter by dxdx*t and knot i by dk[i]*t.
            std::vector<float> vp(v), vm(v);
            for (int i = 0; i < count * nc; ++i) vp[i] += h * dk[i], vm[i] -= h * dk[i];
            SplineKnots kp = k, km = k;
            kp.values = vp.data(), kp.dx = nullptr;
            km.values = vm.data(), km.dx = nullptr;
            D2 rp[3], rm[3];
            evalSpline(b, D2(x + h * dxdx), kp, rp);
            evalSpline(b, D2(x - h * dxdx), km, rm);
            for (int c = 0; c < nc; ++c) {
                const float fd = (rp[c].val() - rm[c].val()) / (2 * h);
                EXPECT_NEAR(r[c].dx(), fd, 2e-2f * std::max(1.0f, std::fabs(fd)))
                    << "basis " << int(b) << " x " << x << " c " << c;
                EXPECT_EQ(r[c].dy(), 0.0f);
            }
        }
    }
}

TEST(SplineEval, ConstantBasisAndClampedParameterHaveNoDerivatives) {
    const std::vector<float> knots = {0, 1, 2, 3, 4};
    SplineKnots k;
    k.values = knots.data();
    k.count = 5;
    D2 r;
    evalSpline(SplineBasis::Constant, D2(0.3f, 1.0f, 1.0f), k, &r);
    EXPECT_EQ(r.dx(), 0.0f);
    evalSpline(SplineBasis::Linear, D2(1.5f, 1.0f, 1.0f), k, &r);
    EXPECT_EQ(r.val(), 3.0f);
    EXPECT_EQ(r.dx(), 0.0f);
    evalSpline(SplineBasis::Linear, D2(0.25f, 1.0f, 0.0f), k, &r);
    EXPECT_NEAR(r.dx(), 2.0f, 1e-5f);
}

// Every "splineinverse(...) = x (derivs dx dy)" line of the reference output, recomputed.
TEST(SplineEval, InverseMatchesReferenceOutput) {
    std::ifstream in(std::string(TESSEL_SHARED_DIR) +
                     "/osl-conformance/testsuite/splineinverse/ref/out.txt");
    ASSERT_TRUE(in) << "reference output missing";
    const std::vector<float> knots = {0, 0, 0.05f, 0.1f, 0.3f, 1, 1};
    std::string line;
    int checked = 0;
    float udx = 0.0f;
    while (std::getline(in, line)) {
        float u, d1, d2;
        if (std::sscanf(line.c_str(), "u = %g (derivs %g %g)", &u, &d1, &d2) == 3) udx = d1;
        char basis[32];
        float y, x, dx, dy;
        if (std::sscanf(line.c_str(), "splineinverse(\"%31[^\"]\", %g) = %g (derivs %g %g)", basis,
                        &y, &x, &dx, &dy) != 5)
            continue;
        const D2 r = invertSpline(splineBasisFromName(basis), D2(y, udx, 0.0f), knots.data(), 7);
        EXPECT_NEAR(r.val(), x, 2e-6f * std::max(1.0f, std::fabs(x))) << line;
        EXPECT_NEAR(r.dx(), dx, 2e-5f * std::max(1.0f, std::fabs(dx))) << line;
        EXPECT_EQ(r.dy(), 0.0f);
        // And the spline at the answer gives y back.
        EXPECT_NEAR(evalFloat(splineBasisFromName(basis), r.val(), knots), y, 1e-4f);
        ++checked;
    }
    EXPECT_EQ(checked, 9);
    EXPECT_NEAR(evalFloat(SplineBasis::BSpline, 0.0f, knots), 0.00833333f, 1e-7f);
    EXPECT_NEAR(evalFloat(SplineBasis::BSpline, 1.0f, knots), 0.883333f, 1e-6f);
}

TEST(SplineEval, InverseAtAPlateauBoundary) {
    // Knots that stay flat at 0.6 then jump: values at or below the plateau map to 0.
    const std::vector<float> knots = {0.6f, 0.6f, 0.6f, 0.6f, 1, 1, 1, 1};
    EXPECT_EQ(invertSpline(SplineBasis::BSpline, D2(0.59f), knots.data(), 8).val(), 0.0f);
    EXPECT_EQ(invertSpline(SplineBasis::BSpline, D2(0.6f), knots.data(), 8).val(), 0.0f);
    EXPECT_NEAR(invertSpline(SplineBasis::BSpline, D2(0.61f), knots.data(), 8).val(), 0.306262f,
                1e-6f);
}

TEST(SplineEval, InverseOfDescendingKnots) {
    const std::vector<float> knots = {1.0f, 0.95f, 0.85f,  0.8f,  0.65f, 0.59f, 0.58f, 0.55f,
                                      0.5f, 0.3f,  0.275f, 0.25f, 0.2f,  0.1f,  0.05f, 0.0f};
    for (SplineBasis b : {SplineBasis::CatmullRom, SplineBasis::BSpline, SplineBasis::Linear,
                          SplineBasis::Bezier, SplineBasis::Hermite}) {
        for (float y : {0.15f, 0.4f, 0.7f}) {
            const D2 x = invertSpline(b, D2(y, 1.0f, 0.0f), knots.data(), 16);
            EXPECT_GT(x.val(), 0.0f);
            EXPECT_LT(x.val(), 1.0f);
            if (b != SplineBasis::Hermite) {
                EXPECT_NEAR(evalFloat(b, x.val(), knots), y, 1e-4f) << int(b) << " " << y;
            }
        }
        // Beyond the ends: above the first knot is the start, below the last is the end.
        EXPECT_EQ(invertSpline(b, D2(2.0f), knots.data(), 16).val(), 0.0f);
        EXPECT_EQ(invertSpline(b, D2(-1.0f), knots.data(), 16).val(), 1.0f);
    }
    // The derivative is the reciprocal slope: descending knots give a negative one.
    const D2 x = invertSpline(SplineBasis::Linear, D2(0.4f, 1.0f, 0.0f), knots.data(), 16);
    const float slope = (evalFloat(SplineBasis::Linear, x.val() + 1e-3f, knots) -
                         evalFloat(SplineBasis::Linear, x.val() - 1e-3f, knots)) /
                        2e-3f;
    EXPECT_NEAR(x.dx(), 1.0f / slope, 1e-2f * std::fabs(1.0f / slope));
}

// The spline-derivbug case: colour bspline through u, printed at the first of the two centre
// pixels of a 64x64 grid whose u runs from 0 to 1.
TEST(SplineEval, ColourKnotsMatchReferenceOutput) {
    const std::vector<float> colors = {0, 0, 0, 0, 0, 0, 1, 0, 0, 0, 1, 0,
                                       0, 0, 1, 0, 1, 1, 1, 1, 1, 1, 1, 1};
    SplineKnots k;
    k.values = colors.data();
    k.count = 8;
    k.ncomp = 3;
    D2 r[3];
    evalSpline(SplineBasis::BSpline, D2(31.0f / 63.0f, 1.0f / 63.0f, 0.0f), k, r);
    // Printed to three significant digits: half a unit of the last digit.
    const float want[3] = {0.0262f, 0.52f, 0.47f}, wantTol[3] = {0.00005f, 0.005f, 0.005f};
    const float wantDx[3] = {-0.0116f, -0.0394f, 0.0594f};
    for (int c = 0; c < 3; ++c) {
        EXPECT_NEAR(r[c].val(), want[c], wantTol[c]) << c;
        EXPECT_NEAR(r[c].dx(), wantDx[c], 0.00005f) << c;
        EXPECT_EQ(r[c].dy(), 0.0f);
    }
}

// ---- the ops, through the shading system ------------------------------------------------------

const char* kSplineCountOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader splinecount
param	int	count	5		%read{1,2} %write{2147483647,-1}
param	float	x	0.5		%read{1,2} %write{2147483647,-1}
param	string	basis	"linear"		%read{1,2} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{1,1}
oparam	float	inv	0		%read{2147483647,-1} %write{2,2}
local	float[5]	knots	%read{1,2} %write{0,0}
const	float[5]	$const1	0 1 2 3 10		%read{0,0} %write{2147483647,-1}
code ___main___
	assign		knots $const1 	%argrw{"wr"}
	spline		out basis x count knots 	%argrw{"wrrrr"}
	splineinverse		inv basis x count knots 	%argrw{"wrrrr"}
	end
)";

class SplineOpTest : public ShadingFixture {
protected:
    SplineOpTest() : ShadingFixture({{"splinecount", kSplineCountOso}}) {}

    float run(int count, float x, const char* basis, const char* symbol) {
        const ustring b(basis);
        ShaderGroupRef g =
            single("splinecount",
                   {{"count", TypeInt, &count}, {"x", TypeFloat, &x}, {"basis", TypeString, &b}});
        return ShadingFixture::run<float>(*g, symbol);
    }
};

TEST_F(SplineOpTest, ExplicitKnotCountUsesOnlyThatManyKnots) {
    // Five knots: linear runs 1 -> 2 -> 3 over two segments; four: 1 -> 2 only.
    EXPECT_NEAR(run(5, 0.5f, "linear", "out"), 2.0f, 1e-6f);
    EXPECT_NEAR(run(4, 0.5f, "linear", "out"), 1.5f, 1e-6f);
    EXPECT_NEAR(run(5, 1.5f, "linear", "inv"), 0.25f, 1e-5f);
    EXPECT_NEAR(run(4, 0.5f, "constant", "out"), 1.0f, 1e-6f);
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
}

TEST_F(SplineOpTest, BadKnotCountsAreReportedAndGiveZero) {
    EXPECT_EQ(run(3, 0.5f, "linear", "out"), 0.0f);
    EXPECT_NE(handler.errors.find("spline has 3 knots"), std::string::npos) << handler.errors;
    handler.errors.clear();
    EXPECT_EQ(run(6, 0.5f, "catmull-rom", "out"), 0.0f);
    EXPECT_NE(handler.errors.find("at most the array's 5"), std::string::npos) << handler.errors;
    handler.errors.clear();
    EXPECT_EQ(run(-1, 0.5f, "bspline", "inv"), 0.0f);
    EXPECT_NE(handler.errors.find("splineinverse has -1 knots"), std::string::npos)
        << handler.errors;
}

} // namespace
