// The "debug_uninit" and "debug_nan" modes: reads of never-written values and non-finite results
// are reported with where they happened, and nothing is reported when the modes are off.
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <limits>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

// out = f + 1 where the local f is never assigned; g[1] is set and read, g[2] only read.
const char* kUninitOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader uninit
oparam	float	out	0		%read{2147483647,-1} %write{0,4}
local	float	___12_f	%read{0,0} %write{2147483647,-1}
local	float[3]	g	%read{2,3} %write{1,1}
temp	float	$tmp1	%read{2147483647,-1} %write{2,2}
temp	float	$tmp2	%read{4,4} %write{3,3}
const	float	$const1	1		%read{0,1} %write{2147483647,-1}
const	int	$const2	1		%read{1,2} %write{2147483647,-1}
const	int	$const3	2		%read{3,3} %write{2147483647,-1}
code ___main___
	add		out ___12_f $const1 	%filename{"uninit.osl"} %line{5} %argrw{"wrr"}
	aassign		g $const2 $const1 	%line{6} %argrw{"wrr"}
	aref		$tmp1 g $const2 	%line{7} %argrw{"wrr"}
	aref		$tmp2 g $const3 	%line{8} %argrw{"wrr"}
	add		out out $tmp2 	%argrw{"wrr"}
	end
)";

// out = x * 2
const char* kScaleOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader scale
param	float	x	1		%read{0,0} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{0,0}
const	float	$const1	2		%read{0,0} %write{2147483647,-1}
code ___main___
	mul		out x $const1 	%filename{"scale.osl"} %line{4} %argrw{"wrr"}
	end
)";

class DebugChecks : public ShadingFixture {
protected:
    DebugChecks() : ShadingFixture({{"uninit", kUninitOso}, {"scale", kScaleOso}}) {}

    // Runs a one-layer group once and returns its "out".
    float runOnce(const char* shader, const float* x = nullptr) {
        std::vector<Param> params;
        if (x) params.push_back({"x", TypeFloat, x});
        ShaderGroupRef g = single(shader, params, "l", "dbg");
        return run<float>(*g, "out");
    }
};

TEST_F(DebugChecks, UninitializedReadsAreReportedWithTheirPlace) {
    ss.attribute("debug_uninit", 1);
    const float out = runOnce("uninit");
    EXPECT_NE(handler.errors.find("Detected possible use of uninitialized value in float f at "
                                  "uninit.osl:5 (group dbg, layer 0 l, shader uninit, op 0 "
                                  "'add', arg 1)"),
              std::string::npos)
        << handler.errors;
    EXPECT_NE(handler.errors.find("uninitialized value in float[3] g at uninit.osl:8 (group dbg, "
                                  "layer 0 l, shader uninit, op 3 'aref', arg 1)"),
              std::string::npos)
        << handler.errors;
    // The element that was written is not reported, and reported values read as zero.
    EXPECT_EQ(handler.errors.find("uninit.osl:7"), std::string::npos) << handler.errors;
    EXPECT_FLOAT_EQ(out, 1.0f);
}

TEST_F(DebugChecks, NothingIsReportedWithoutTheMode) {
    runOnce("uninit");
    const float inf = std::numeric_limits<float>::infinity();
    runOnce("scale", &inf);
    EXPECT_EQ(handler.errors, "");
}

TEST_F(DebugChecks, NonFiniteResultsAreReported) {
    ss.attribute("debug_nan", 1);
    const float nan = std::numeric_limits<float>::quiet_NaN();
    runOnce("scale", &nan);
    EXPECT_NE(handler.errors.find("Detected nan value in out at scale.osl:4 (op mul)"),
              std::string::npos)
        << handler.errors;
    handler.errors.clear();
    const float inf = -std::numeric_limits<float>::infinity();
    runOnce("scale", &inf);
    EXPECT_NE(handler.errors.find("Detected -inf value in out at scale.osl:4 (op mul)"),
              std::string::npos)
        << handler.errors;
    handler.errors.clear();
    const float fine = 3.0f;
    EXPECT_FLOAT_EQ(runOnce("scale", &fine), 6.0f);
    EXPECT_EQ(handler.errors, "");
}

} // namespace
