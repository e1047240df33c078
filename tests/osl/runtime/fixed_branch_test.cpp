// A branch that fixed parameters rule out never runs, so the derivatives only it asks for are
// not computed: values elsewhere come out as they do without derivatives (pow(0, 0) is 1 by
// value but 0 through the derivative form, as the reference computes them).
#include "runtime_test_support.h"

namespace {

using runtime_test::Param;

// out = pow(a, a) with a = u * 0; when takeDx is set, out = Dx(out) instead.
const char* kFixedBranchOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader fixedbranch
param	int	takeDx	0		%read{2,2} %write{2147483647,-1}
oparam	float	out	0		%read{3,3} %write{1,3}
global	float	u	%read{0,0} %write{2147483647,-1}
local	float	a	%read{1,1} %write{0,0}
const	float	$const1	0		%read{0,0} %write{2147483647,-1}
code ___main___
	mul		a u $const1 	%argrw{"wrr"}
	pow		out a a 	%argrw{"wrr"}
	if		takeDx 4 4 	%argrw{"r"}
	Dx		out out 	%argrw{"wr"}
	end
)";

// out = u * 3; when takeDx is set, out = Dx(out).
const char* kScaledOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader scaled
param	int	takeDx	0		%read{1,1} %write{2147483647,-1}
oparam	float	out	0		%read{2,2} %write{0,2}
global	float	u	%read{0,0} %write{2147483647,-1}
const	float	$const1	3		%read{0,0} %write{2147483647,-1}
code ___main___
	mul		out u $const1 	%argrw{"wrr"}
	if		takeDx 3 3 	%argrw{"r"}
	Dx		out out 	%argrw{"wr"}
	end
)";

class FixedBranchTest : public runtime_test::ShadingFixture {
protected:
    FixedBranchTest()
        : ShadingFixture({{"fixedbranch", kFixedBranchOso}, {"scaled", kScaledOso}}) {}
};

TEST_F(FixedBranchTest, BranchRuledOutByAFixedParameterAsksForNoDerivatives) {
    // takeDx keeps its default 0 for the whole group: the Dx never runs and pow is computed
    // by value.
    OSL::ShaderGroupRef g = single("fixedbranch");
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 1.0f);
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
}

TEST_F(FixedBranchTest, BranchTakenOrUndecidedKeepsItsDerivatives) {
    const int one = 1;
    // Fixed and taken.
    OSL::ShaderGroupRef taken = single("scaled", {Param{"takeDx", OSL::TypeDesc::INT, &one}});
    EXPECT_NEAR(run<float>(*taken, "out"), 0.3f, 1e-6f);
    // Free to change per point (lockgeom off): the branch may run, so derivatives are kept.
    OSL::ShaderGroupRef free = single("scaled", {Param{"takeDx", OSL::TypeDesc::INT, &one, false}});
    EXPECT_NEAR(run<float>(*free, "out"), 0.3f, 1e-6f);
    // Fixed and not taken: the plain value.
    OSL::ShaderGroupRef plain = single("scaled");
    EXPECT_FLOAT_EQ(run<float>(*plain, "out"), 1.5f);
}

TEST_F(FixedBranchTest, WithoutTheOptimiserTheBranchStillDecidesPerPoint) {
    ss.attribute("optimize", 0);
    const int one = 1;
    OSL::ShaderGroupRef taken = single("scaled", {Param{"takeDx", OSL::TypeDesc::INT, &one}});
    EXPECT_NEAR(run<float>(*taken, "out"), 0.3f, 1e-6f);
    OSL::ShaderGroupRef plain = single("scaled");
    EXPECT_FLOAT_EQ(run<float>(*plain, "out"), 1.5f);
}

} // namespace
