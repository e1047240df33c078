// Derivatives through every form of the noise ops: a differentiated result agrees with finite
// differences, and when the result needs none only the positions of gabor noise, which filters
// over their footprint, carry derivatives (never periods, times or the other kinds' operands).
#include "../../../osl/runtime/gabor_noise.h"
#include "../../../osl/runtime/program.h"
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <set>
#include <sstream>
#include <string>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

// val = OP(ARGS) over prepared operands, and with `differentiate` dval = Dx(val). The operands:
// p = P * 2, per = P + 4, x = u * 2, y = v * 2, px = u + 4, py = v + 4, t = u * 3, the string
// parameter `kind` ("gabor" unless given), the names $perlin $simplex $cell $hash $gabor, and
// the periods $period (a point) and $three.
std::string noiseOso(const std::string& op, const std::string& args, bool differentiate) {
    std::string rw = "w";
    std::istringstream words(args);
    for (std::string w; words >> w;) rw += 'r';
    std::string oso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader form
param	string	kind	"gabor"
oparam	float	val	0
oparam	float	dval	0
global	point	P	%read{0,1} %write{2147483647,-1}
global	float	u	%read{2,6} %write{2147483647,-1}
global	float	v	%read{3,5} %write{2147483647,-1}
local	point	p
local	point	per
local	float	x
local	float	y
local	float	px
local	float	py
local	float	t
const	float	$two	2
const	float	$three	3
const	float	$four	4
const	point	$period	3 3 3
const	string	$perlin	"perlin"
const	string	$simplex	"simplex"
const	string	$cell	"cell"
const	string	$hash	"hash"
const	string	$gabor	"gabor"
const	string	$do_filter	"do_filter"
const	int	$zero	0
code ___main___
	mul		p P $two 	%argrw{"wrr"}
	add		per P $four 	%argrw{"wrr"}
	mul		x u $two 	%argrw{"wrr"}
	mul		y v $two 	%argrw{"wrr"}
	add		px u $four 	%argrw{"wrr"}
	add		py v $four 	%argrw{"wrr"}
	mul		t u $three 	%argrw{"wrr"}
)";
    oso += "\t" + op + "\t\tval " + args + " \t%argrw{\"" + rw + "\"}\n";
    if (differentiate) oso += "\tDx\t\tdval val \t%argrw{\"wr\"}\n";
    return oso + "\tend\n";
}

struct Form {
    const char* op;
    const char* args;
    std::vector<std::string> carriers; // operands that take derivatives with a plain result
    bool steps = false;                // piecewise constant: no derivatives at all
    bool periodVaries = false;         // no finite differences: periods have no derivatives
};

const Form kForms[] = {
    {"noise", "p", {}},
    {"snoise", "p", {}},
    {"noise", "$perlin p", {}},
    {"noise", "$simplex p", {}},
    {"noise", "p t", {}},
    {"snoise", "x", {}},
    {"noise", "x y", {}},
    {"cellnoise", "p", {}, true},
    {"hashnoise", "p", {}, true},
    {"noise", "$cell p", {}, true},
    {"noise", "$hash x y", {}, true},
    {"noise", "$gabor p", {"p"}},
    {"noise", "$gabor p $do_filter $zero", {"p"}},
    {"noise", "$gabor p t", {"p"}},
    {"noise", "$gabor x", {"x"}},
    {"noise", "$gabor x y", {"x", "y"}},
    {"noise", "kind p", {"p"}},
    {"noise", "kind x y", {"x", "y"}},
    {"pnoise", "p $period", {}},
    {"psnoise", "p $period", {}},
    {"pnoise", "$perlin p $period", {}},
    {"pnoise", "$cell p $period", {}, true},
    {"pnoise", "$gabor p $period", {"p"}},
    {"pnoise", "$gabor p $period $do_filter $zero", {"p"}},
    {"pnoise", "$gabor x $three", {"x"}},
    {"pnoise", "$gabor x y $three $three", {"x", "y"}},
    {"pnoise", "kind p $period", {"p"}},
    {"psnoise", "p per", {}, false, true},
    {"pnoise", "x y px py", {}, false, true},
    {"pnoise", "$gabor p per", {"p"}, false, true},
    {"pnoise", "$gabor x px", {"x"}, false, true},
    {"pnoise", "$gabor x y px py", {"x", "y"}, false, true},
    {"pnoise", "kind p per", {"p"}, false, true},
};

std::string describe(const Form& f) {
    return std::string(f.op) + "(" + f.args + ")";
}

class NoiseOpDerivatives : public ShadingFixture {
protected:
    NoiseOpDerivatives() : ShadingFixture({}) {}

    // A group running `f`, its shader loaded on first use.
    ShaderGroupRef load(const Form& f, bool differentiate, const std::vector<Param>& params = {}) {
        const std::string name = std::string(differentiate ? "d_" : "v_") + describe(f);
        if (loaded.insert(name).second) {
            EXPECT_TRUE(ss.LoadMemoryCompiledShader(name, noiseOso(f.op, f.args, differentiate)))
                << name << handler.errors;
        }
        return single(name.c_str(), params);
    }

    std::set<std::string> loaded;
};

TEST_F(NoiseOpDerivatives, DifferentiatedResultsAgreeWithFiniteDifferences) {
    // u moves by 0.1 per pixel in x, and P = (u, v, 1).
    const float u = 0.43f, v = 0.57f, h = 5e-4f;
    for (const Form& f : kForms) {
        if (f.periodVaries) continue;
        ShaderGroupRef g = load(f, true);
        const float lo = run<float>(*g, "val", u - h, v);
        const float hi = run<float>(*g, "val", u + h, v);
        const float dx = run<float>(*g, "dval", u, v);
        const float expected = 0.1f * (hi - lo) / (2.0f * h);
        if (f.steps) {
            EXPECT_EQ(dx, 0.0f) << describe(f);
            continue;
        }
        EXPECT_GT(std::fabs(expected), 1e-3f) << describe(f) << " (a flat spot proves nothing)";
        EXPECT_NEAR(dx, expected, 2e-3f + 2e-2f * std::fabs(expected)) << describe(f);
    }
    EXPECT_EQ(handler.errors, "");
}

TEST_F(NoiseOpDerivatives, OnlyGaborPositionsCarryDerivativesForAPlainResult) {
    const std::vector<std::string> locals = {"p", "per", "x", "y", "px", "py", "t"};
    for (const Form& f : kForms) {
        ShaderGroupRef g = load(f, false);
        std::istringstream words(f.args);
        for (std::string w; words >> w;) {
            if (std::find(locals.begin(), locals.end(), w) == locals.end()) continue;
            const ShaderSymbol* sym = ss.find_symbol(*g, ustring(w));
            ASSERT_NE(sym, nullptr) << describe(f) << " " << w;
            const bool carrier =
                std::find(f.carriers.begin(), f.carriers.end(), w) != f.carriers.end();
            EXPECT_EQ(sym->derivs, carrier) << describe(f) << ": " << w;
        }
    }
}

TEST_F(NoiseOpDerivatives, ValuesDoNotDependOnWhetherTheResultIsDifferentiated) {
    const float u = 0.37f, v = 0.61f;
    for (const Form& f : kForms) {
        ShaderGroupRef plain = load(f, false), differentiated = load(f, true);
        EXPECT_EQ(run<float>(*plain, "val", u, v), run<float>(*differentiated, "val", u, v))
            << describe(f);
    }
    // Gabor noise of a position whose result is not differentiated is still filtered over the
    // position's footprint (p = 2 P moves by 0.2 per pixel), which changes its value.
    const Form gabor{"noise", "$gabor p", {"p"}};
    ShaderGroupRef g = load(gabor, false);
    const Vec3 p(2.0f * u, 2.0f * v, 2.0f);
    Dual2<float> filtered, unfiltered;
    gaborNoise(Dual2<Vec3>(p, Vec3(0.2f, 0.0f, 0.0f), Vec3(0.0f, 0.2f, 0.0f)), nullptr,
               GaborOptions(), 1, &filtered);
    gaborNoise(Dual2<Vec3>(p), nullptr, GaborOptions(), 1, &unfiltered);
    ASSERT_NE(filtered.val(), unfiltered.val());
    EXPECT_EQ(run<float>(*g, "val", u, v), filtered.val());
}

TEST_F(NoiseOpDerivatives, NameKnownOnlyWhileShadingStillFiltersGabor) {
    // kind is a parameter: as "gabor" it filters over p's footprint like the named form.
    const float u = 0.37f, v = 0.61f;
    const ustring perlin("perlin");
    const Form byName{"noise", "kind p", {"p"}};
    ShaderGroupRef gabor = load(byName, false);
    ShaderGroupRef plain = load(byName, false, {{"kind", TypeString, &perlin}});
    EXPECT_EQ(run<float>(*gabor, "val", u, v),
              run<float>(*load({"noise", "$gabor p", {"p"}}, false), "val", u, v));
    EXPECT_EQ(run<float>(*plain, "val", u, v),
              run<float>(*load({"noise", "$perlin p", {}}, false), "val", u, v));
    EXPECT_EQ(handler.errors, "");
}

} // namespace
