// The group-time optimiser: what it folds and what it must leave alone, dead ops, instance
// merging, its warnings, and that shading gives the same results with it on and off.
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <OpenImageIO/filesystem.h>

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

// t = 2 * a; t2 = t + 1; fixed = isconstant(t2); out = t2; gone = sin(u) is never read.
const char* kFoldOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader fold
param	float	a	3		%read{0,0} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{3,3}
oparam	int	fixed	0		%read{2147483647,-1} %write{2,2}
global	float	u	%read{4,4} %write{2147483647,-1}
temp	float	t	%read{1,1} %write{0,0}
temp	float	t2	%read{2,3} %write{1,1}
temp	float	gone	%read{2147483647,-1} %write{4,4}
const	float	$c2	2		%read{0,0} %write{2147483647,-1}
const	float	$c1	1		%read{1,1} %write{2147483647,-1}
code ___main___
	mul		t $c2 a 	%argrw{"wrr"}
	add		t2 t $c1 	%argrw{"wrr"}
	isconstant		fixed t2 	%argrw{"wr"}
	assign		out t2 	%argrw{"wr"}
	sin		gone u 	%argrw{"wr"}
	end
)";

// if (flag) t = 2 * a; fixed = isconstant(t); out = t.
const char* kGuardedOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader guarded
param	float	a	3		%read{1,1} %write{2147483647,-1}
param	int	flag	1		%read{0,0} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{3,3}
oparam	int	fixed	0		%read{2147483647,-1} %write{2,2}
temp	float	t	%read{2,3} %write{1,1}
const	float	$c2	2		%read{1,1} %write{2147483647,-1}
code ___main___
	if		flag 2 2 	%argrw{"r"}
	mul		t $c2 a 	%argrw{"wrr"}
	isconstant		fixed t 	%argrw{"wr"}
	assign		out t 	%argrw{"wr"}
	end
)";

// for (i = 0; i < 2; i += 1) t = 2 * a; fixed = isconstant(t); out = t.
const char* kLoopedOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader looped
param	float	a	3		%read{3,3} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{6,6}
oparam	int	fixed	0		%read{2147483647,-1} %write{5,5}
local	int	i	%read{2,4} %write{1,4}
temp	int	$tmp1	%read{0,0} %write{2,2}
temp	float	t	%read{5,6} %write{3,3}
const	int	$i0	0		%read{1,1} %write{2147483647,-1}
const	int	$i1	1		%read{4,4} %write{2147483647,-1}
const	int	$i2	2		%read{2,2} %write{2147483647,-1}
const	float	$c2	2		%read{3,3} %write{2147483647,-1}
code ___main___
	for		$tmp1 2 3 4 5 	%argrw{"r"}
	assign		i $i0 	%argrw{"wr"}
	lt		$tmp1 i $i2 	%argrw{"wrr"}
	mul		t $c2 a 	%argrw{"wrr"}
	add		i i $i1 	%argrw{"wrr"}
	isconstant		fixed t 	%argrw{"wr"}
	assign		out t 	%argrw{"wr"}
	end
)";

// t is read before the op that would make it 2 * a: it must keep its first value there.
const char* kReadFirstOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader readfirst
param	float	a	3		%read{1,1} %write{2147483647,-1}
oparam	float	before	0		%read{2147483647,-1} %write{0,0}
oparam	float	after	0		%read{2147483647,-1} %write{2,2}
temp	float	t	%read{0,2} %write{1,1}
const	float	$c2	2		%read{1,1} %write{2147483647,-1}
code ___main___
	assign		before t 	%argrw{"wr"}
	mul		t $c2 a 	%argrw{"wrr"}
	assign		after t 	%argrw{"wr"}
	end
)";

// Prints its name and x; out = x * u. x comes from the geometry.
const char* kNoisyOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader noisy
param	float	x	1		%meta{int,lockgeom,0} %read{0,1} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{1,1}
global	float	u	%read{1,1} %write{2147483647,-1}
const	string	$fmt	"noisy %g\n"		%read{0,0} %write{2147483647,-1}
code ___main___
	printf		$fmt x 	%argrw{"rr"}
	mul		out x u 	%argrw{"wrr"}
	end
)";

// s = format("f%d", frame) with frame from the geometry; then a texture lookup by that name.
const char* kWarnOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader warner
param	int	frame	1		%meta{int,lockgeom,0} %read{0,0} %write{2147483647,-1}
oparam	color	C	0 0 0		%read{2147483647,-1} %write{1,1}
global	float	u	%read{1,1} %write{2147483647,-1}
global	float	v	%read{1,1} %write{2147483647,-1}
temp	string	s	%read{1,1} %write{0,0}
const	string	$fmt	"f%d"		%read{0,0} %write{2147483647,-1}
code ___main___
	format		s $fmt frame 	%filename{"warner.osl"} %line{7} %argrw{"wrr"}
	texture		C s u v 	%line{8} %argrw{"wrrr"}
	end
)";

// x = u * u; t = x; x = x + 1; before = t (the copy's value, not x's); after = x.
const char* kCopyOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader copy
oparam	float	before	0		%read{2147483647,-1} %write{3,3}
oparam	float	after	0		%read{2147483647,-1} %write{4,4}
global	float	u	%read{0,0} %write{2147483647,-1}
local	float	x	%read{1,4} %write{0,2}
temp	float	t	%read{3,3} %write{1,1}
const	float	$c1	1		%read{2,2} %write{2147483647,-1}
code ___main___
	mul		x u u 	%argrw{"wrr"}
	assign		t x 	%argrw{"wr"}
	add		x x $c1 	%argrw{"wrr"}
	assign		before t 	%argrw{"wr"}
	assign		after x 	%argrw{"wr"}
	end
)";

// if (flag) t = u * 2; out = t; then sum = u + u and twice = u * 2, each through a temporary.
const char* kCopyGuardedOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader copyguarded
param	int	flag	0		%read{0,0} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{3,3}
oparam	float	sum	0		%read{2147483647,-1} %write{5,5}
oparam	float	twice	0		%read{2147483647,-1} %write{7,7}
global	float	u	%read{1,6} %write{2147483647,-1}
temp	float	x	%read{2,2} %write{1,1}
temp	float	t	%read{3,3} %write{2,2}
temp	float	s	%read{5,5} %write{4,4}
temp	float	r	%read{7,7} %write{6,6}
const	float	$c2	2		%read{1,6} %write{2147483647,-1}
code ___main___
	if		flag 3 3 	%argrw{"r"}
	mul		x u $c2 	%argrw{"wrr"}
	assign		t x 	%argrw{"wr"}
	assign		out t 	%argrw{"wr"}
	add		s u u 	%argrw{"wrr"}
	assign		sum s 	%argrw{"wr"}
	mul		r u $c2 	%argrw{"wrr"}
	assign		twice r 	%argrw{"wr"}
	end
)";

class OptimizerTest : public ShadingFixture {
protected:
    OptimizerTest()
        : ShadingFixture({{"fold", kFoldOso},
                          {"guarded", kGuardedOso},
                          {"looped", kLoopedOso},
                          {"readfirst", kReadFirstOso},
                          {"noisy", kNoisyOso},
                          {"warner", kWarnOso},
                          {"add", kAddOso},
                          {"loop", kLoopOso},
                          {"derivs", kDerivsOso},
                          {"printer", kPrintOso},
                          {"upstream", kUpstreamOso},
                          {"downstream", kDownstreamOso},
                          {"copy", kCopyOso},
                          {"copyguarded", kCopyGuardedOso}}) {}

    // A one-layer group built at the given optimisation level.
    ShaderGroupRef single(const char* shader, int optimize = 2,
                          const std::vector<Param>& params = {}) {
        ss.attribute("optimize", optimize);
        return ShadingFixture::single(shader, params);
    }
    int stat(ShaderGroup& g, const char* name) {
        int v = -1;
        EXPECT_TRUE(ss.getattribute(&g, name, TypeInt, &v)) << name;
        return v;
    }
};

TEST_F(OptimizerTest, FoldsArithmeticOnFixedParameters) {
    ShaderGroupRef g = single("fold");
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 7.0f);
    EXPECT_EQ(run<int>(*g, "fixed"), 1);
    EXPECT_GE(stat(*g, "stat:ops_folded"), 2);
    // The two folded ops and the unread sin are gone; isconstant and the assignment write
    // outputs and stay.
    ShaderGroupRef plain = single("fold", 0);
    EXPECT_EQ(run<int>(*plain, "fixed"), 0);
    EXPECT_FLOAT_EQ(run<float>(*plain, "out"), 7.0f);
    EXPECT_EQ(stat(*plain, "stat:ops_removed"), 0);
    EXPECT_EQ(stat(*g, "stat:instructions"), stat(*plain, "stat:instructions") - 3);
    EXPECT_EQ(stat(*g, "stat:ops_removed"), 3);
}

TEST_F(OptimizerTest, InstanceValuesAreFoldedToo) {
    const float a = 10.0f;
    ShaderGroupRef g = single("fold", 2, {{"a", TypeFloat, &a}});
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 21.0f);
    EXPECT_EQ(run<int>(*g, "fixed"), 1);
}

TEST_F(OptimizerTest, GeometricParametersAreNotFixed) {
    const float a = 4.0f;
    ShaderGroupRef g = single("fold", 2, {{"a", TypeFloat, &a, false}});
    EXPECT_EQ(run<int>(*g, "fixed"), 0);
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 9.0f);
    EXPECT_EQ(stat(*g, "stat:ops_folded"), 0);
}

TEST_F(OptimizerTest, ValuesWrittenUnderAConditionAreNotFixed) {
    ShaderGroupRef g = single("guarded");
    EXPECT_EQ(run<int>(*g, "fixed"), 0);
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 6.0f);
    const int flag = 0;
    ShaderGroupRef off = single("guarded", 2, {{"flag", TypeInt, &flag}});
    EXPECT_FLOAT_EQ(run<float>(*off, "out"), 0.0f);
}

TEST_F(OptimizerTest, ValuesWrittenInALoopAreNotFixed) {
    ShaderGroupRef g = single("looped");
    EXPECT_EQ(run<int>(*g, "fixed"), 0);
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 6.0f);
    EXPECT_EQ(stat(*g, "stat:ops_folded"), 0);
}

TEST_F(OptimizerTest, ReadsBeforeTheWriteKeepTheStartingValue) {
    ShaderGroupRef g = single("readfirst");
    EXPECT_FLOAT_EQ(run<float>(*g, "before"), 0.0f);
    EXPECT_FLOAT_EQ(run<float>(*g, "after"), 6.0f);
}

TEST_F(OptimizerTest, CopiesAreNotBypassedWhenTheSourceChanges) {
    ShaderGroupRef g = single("copy");
    EXPECT_FLOAT_EQ(run<float>(*g, "before", 0.5f), 0.25f);
    EXPECT_FLOAT_EQ(run<float>(*g, "after", 0.5f), 1.25f);
}

TEST_F(OptimizerTest, CopiesUnderAConditionStayThere) {
    ShaderGroupRef g = single("copyguarded");
    EXPECT_FLOAT_EQ(run<float>(*g, "out", 0.5f), 0.0f);
    // The add and the mul write the outputs directly: the copies of their results are gone.
    EXPECT_FLOAT_EQ(run<float>(*g, "sum", 0.5f), 1.0f);
    EXPECT_FLOAT_EQ(run<float>(*g, "twice", 0.5f), 1.0f);
    ShaderGroupRef plain = single("copyguarded", 0);
    EXPECT_LE(stat(*g, "stat:instructions"), stat(*plain, "stat:instructions") - 2);
}

TEST_F(OptimizerTest, OptionsSwitchPartsOff) {
    ss.attribute("opt_constant_fold", 0);
    ShaderGroupRef nofold = single("fold");
    EXPECT_EQ(stat(*nofold, "stat:ops_folded"), 0);
    EXPECT_EQ(run<int>(*nofold, "fixed"), 0);
    // The unread sin still goes.
    EXPECT_GE(stat(*nofold, "stat:ops_removed"), 1);
    ss.attribute("opt_constant_fold", 1);
    ss.attribute("opt_elide_useless_ops", 0);
    ShaderGroupRef keep = single("fold");
    EXPECT_EQ(stat(*keep, "stat:ops_removed"), stat(*keep, "stat:ops_folded"));
    int v = -1;
    EXPECT_TRUE(ss.getattribute("opt_elide_useless_ops", TypeInt, &v));
    EXPECT_EQ(v, 0);
}

TEST_F(OptimizerTest, IdenticalLayersRunOnceUnlessTheyReadUserdata) {
    auto build = [&](int withUserdata, std::string& printed) {
        ss.attribute("opt_merge_instances_with_userdata", withUserdata);
        ShaderGroupRef g = ss.ShaderGroupBegin("");
        EXPECT_TRUE(ss.Shader(*g, "surface", "noisy", "n1"));
        EXPECT_TRUE(ss.Shader(*g, "surface", "noisy", "n2"));
        EXPECT_TRUE(ss.Shader(*g, "surface", "add", "sum"));
        EXPECT_TRUE(ss.ConnectShaders(*g, "n1", "out", "sum", "a"));
        EXPECT_TRUE(ss.ConnectShaders(*g, "n2", "out", "sum", "b"));
        EXPECT_TRUE(ss.ShaderGroupEnd(*g));
        handler.messages.clear();
        const float out = run<float>(*g, "out", 0.5f);
        printed = handler.messages;
        EXPECT_EQ(stat(*g, "stat:layers_merged"), withUserdata ? 1 : 0);
        return out;
    };
    std::string once, twice;
    EXPECT_FLOAT_EQ(build(1, once), 1.0f);
    EXPECT_EQ(once, "noisy 1\n");
    EXPECT_FLOAT_EQ(build(0, twice), 1.0f);
    EXPECT_EQ(twice, "noisy 1\nnoisy 1\n");
}

TEST_F(OptimizerTest, LayersWithDifferentValuesAreNotMerged) {
    ss.attribute("optimize", 2);
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    const float k2 = 2.0f, k3 = 3.0f;
    ss.Parameter(*g, "k", TypeFloat, &k2);
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "u1"));
    ss.Parameter(*g, "k", TypeFloat, &k3);
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "u2"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "add", "sum"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "u1", "out", "sum", "a"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "u2", "out", "sum", "b"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    EXPECT_EQ(stat(*g, "stat:layers_merged"), 0);
    EXPECT_FLOAT_EQ(run<float>(*g, "out", 0.5f), 2.5f);
}

TEST_F(OptimizerTest, WarnsAboutStringsAndTextureNamesMadeAtRunTime) {
    ss.attribute("opt_warnings", 1);
    ss.attribute("optimize", 2);
    ShaderGroupRef g = ss.ShaderGroupBegin("G");
    ASSERT_TRUE(ss.Shader(*g, "surface", "warner", "L"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    EXPECT_NE(handler.warnings.find("Optimization warning:\n  group:  G\n  layer:  L\n"
                                    "  source: warner.osl:7\n  issue:  format(): new string "
                                    "creation couldn't be optimized to a constant."),
              std::string::npos)
        << handler.warnings;
    EXPECT_NE(handler.warnings.find("  source: warner.osl:8\n  issue:  texture(): texture name "
                                    "cannot be converted to a handle."),
              std::string::npos)
        << handler.warnings;
    // With a frame fixed for the group the name is folded and nothing is left to warn about.
    std::string fixedOso = kWarnOso;
    fixedOso.erase(fixedOso.find("%meta{int,lockgeom,0} "), 22);
    ASSERT_TRUE(ss.LoadMemoryCompiledShader("fixedwarner", fixedOso));
    handler.warnings.clear();
    ShaderGroupRef fixed = ss.ShaderGroupBegin("G2");
    ASSERT_TRUE(ss.Shader(*fixed, "surface", "fixedwarner", "L"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*fixed));
    EXPECT_EQ(handler.warnings, "");
}

TEST_F(OptimizerTest, NoWarningsUnlessAskedFor) {
    ShaderGroupRef g = single("warner");
    EXPECT_EQ(handler.warnings, "");
}

// Every value a group writes, as bytes, after shading at a few points.
std::vector<std::string> shadeAll(ShadingSystem& ss, ShadingContext& ctx, ShaderGroup& g,
                                  const std::vector<const char*>& symbols) {
    std::vector<std::string> out;
    for (float u : {0.0f, 0.3f, 0.75f, 1.0f}) {
        ShaderGlobals sg = globalsAt(u, 1.0f - u);
        EXPECT_TRUE(ss.execute(ctx, g, 0, sg));
        for (const char* name : symbols) {
            const ShaderSymbol* sym = ss.find_symbol(g, ustring(name));
            const void* p = sym ? ss.symbol_address(ctx, sym) : nullptr;
            EXPECT_NE(p, nullptr) << name;
            if (!p) continue;
            const TypeDesc t = ss.symbol_typedesc(sym);
            out.emplace_back(static_cast<const char*>(p), t.size());
        }
    }
    return out;
}

TEST_F(OptimizerTest, SameResultsWithAndWithoutOptimisation) {
    struct Case {
        const char* shader;
        std::vector<const char*> outputs;
    };
    const std::vector<Case> cases = {{"fold", {"out"}},
                                     {"guarded", {"out"}},
                                     {"looped", {"out"}},
                                     {"readfirst", {"before", "after"}},
                                     {"add", {"out"}},
                                     {"loop", {"sum"}},
                                     {"derivs", {"d", "w", "a"}},
                                     {"printer", {"formatted"}},
                                     {"upstream", {"out", "col"}},
                                     {"downstream", {"result"}},
                                     {"copy", {"before", "after"}},
                                     {"copyguarded", {"out", "sum", "twice"}}};
    for (const Case& c : cases) {
        ShaderGroupRef on = single(c.shader, 2);
        ShaderGroupRef off = single(c.shader, 0);
        handler.messages.clear();
        const auto a = shadeAll(ss, *ctx, *on, c.outputs);
        const std::string printedOn = handler.messages;
        handler.messages.clear();
        const auto b = shadeAll(ss, *ctx, *off, c.outputs);
        EXPECT_EQ(a, b) << c.shader;
        EXPECT_EQ(printedOn, handler.messages) << c.shader;
    }
}

// Reference-compiled shaders of the conformance suite, on and off: same output images.
TEST_F(OptimizerTest, SameResultsOnReferenceShaders) {
    const char* files[] = {"andor-reg/oso-ref/a_float_u_b_float_u.oso", "derivs/oso-ref/test.oso",
                           "normalize-reg/oso-ref/test.oso"};
    int loaded = 0;
    for (const char* f : files) {
        std::string oso;
        const std::string path = std::string(TESSEL_SHARED_DIR) + "/osl-conformance/testsuite/" + f;
        if (!OIIO::Filesystem::read_text_file(path, oso)) continue;
        const std::string name = "ref" + std::to_string(loaded++);
        ASSERT_TRUE(ss.LoadMemoryCompiledShader(name, oso)) << f;
        ShaderGroupRef on = single(name.c_str(), 2);
        ShaderGroupRef off = single(name.c_str(), 0);
        std::vector<const char*> outs;
        for (const char* cand : {"Cout", "Cout_color", "Cout_float", "res", "out"})
            if (ss.find_symbol(*on, ustring(cand))) outs.push_back(cand);
        handler.messages.clear();
        const auto a = shadeAll(ss, *ctx, *on, outs);
        const std::string printedOn = handler.messages;
        handler.messages.clear();
        const auto b = shadeAll(ss, *ctx, *off, outs);
        EXPECT_EQ(a, b) << f;
        EXPECT_EQ(printedOn, handler.messages) << f;
    }
    EXPECT_GT(loaded, 0);
}

} // namespace
