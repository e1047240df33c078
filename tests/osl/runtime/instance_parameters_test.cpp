// Instance values given with Parameter(): which types bind, what is reported for the rest, and
// how long pending values wait for a shader.
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

using namespace OSL;
using namespace runtime_test;

namespace {

// out = a + b (floats), tint = c (a colour), n unused.
const char* kParamsOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader params
param	float	a	1		%read{0,0} %write{2147483647,-1}
param	float	b	2		%read{0,0} %write{2147483647,-1}
param	color	c	0 0 0		%read{1,1} %write{2147483647,-1}
param	int	n	3		%read{2147483647,-1} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{0,0}
oparam	color	tint	0 0 0		%read{2147483647,-1} %write{1,1}
code ___main___
	add		out a b 	%argrw{"wrr"}
	assign		tint c 	%argrw{"wr"}
	end
)";

class InstanceParametersTest : public ShadingFixture {
protected:
    InstanceParametersTest() : ShadingFixture({{"params", kParamsOso}}) {}
};

TEST_F(InstanceParametersTest, ValuesWaitPastAShaderThatCannotBeFound) {
    ShaderGroupRef g = ss.ShaderGroupBegin("grp");
    const float a = 10.0f;
    ss.Parameter(*g, "a", TypeFloat, &a);
    EXPECT_FALSE(ss.Shader(*g, "surface", "no_such_shader", ""));
    EXPECT_NE(handler.errors.find("Could not find shader \"no_such_shader\""), std::string::npos);
    ASSERT_TRUE(ss.Shader(*g, "surface", "params", "l"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 12.0f);
}

TEST_F(InstanceParametersTest, ValuesAreUsedOnceByTheShaderThatLoads) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    const float a = 10.0f;
    ss.Parameter(*g, "a", TypeFloat, &a);
    ASSERT_TRUE(ss.Shader(*g, "surface", "params", "first"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "params", "second"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    // Only the last layer runs; it has its defaults.
    EXPECT_FLOAT_EQ(run<float>(*g, "second.out"), 3.0f);
}

TEST_F(InstanceParametersTest, OneFloatFillsATripleAndAnyTripleBindsToAColour) {
    const float half = 0.5f;
    ShaderGroupRef g = single("params", {{"c", TypeFloat, &half}});
    EXPECT_EQ(run<Vec3>(*g, "tint"), Vec3(0.5f));

    const Vec3 v(1.0f, 2.0f, 3.0f);
    ShaderGroupRef g2 = single("params", {{"c", TypeVector, &v}});
    EXPECT_EQ(run<Vec3>(*g2, "tint"), v);
    EXPECT_EQ(handler.warnings, "");
}

TEST_F(InstanceParametersTest, NumbersOfTheWrongTypeAreReportedAndSkipped) {
    const int ten = 10;
    const float half = 0.5f;
    const ustring s("text");
    const float three[3] = {1, 2, 3};
    ShaderGroupRef g = single("params", {{"a", TypeInt, &ten},
                                         {"n", TypeFloat, &half},
                                         {"b", TypeString, &s},
                                         {"c", TypeDesc(TypeDesc::FLOAT, 3), three}});
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 3.0f);
    EXPECT_EQ(run<Vec3>(*g, "tint"), Vec3(0.0f));
    EXPECT_EQ(handler.warnings,
              "attempting to set parameter with wrong type: a (expected 'float', received 'int')\n"
              "attempting to set parameter with wrong type: n (expected 'int', received 'float')\n"
              "attempting to set parameter with wrong type: b (expected 'float', received "
              "'string')\n"
              "attempting to set parameter with wrong type: c (expected 'color', received "
              "'float[3]')\n");
    EXPECT_EQ(handler.errors, "");
}

} // namespace
