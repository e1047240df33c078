// Many threads executing one group give exactly the results of one thread: contexts are
// per thread and the group's program is shared read-only.
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <thread>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

// result = x * x + sin(x)
const char* kMixerOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader mixer
param	float	x	10		%read{0,1} %write{2147483647,-1}
oparam	float	result	0		%read{2,2} %write{1,2}
temp	float	$tmp1	%read{2,2} %write{0,0}
code ___main___
	mul		$tmp1 x x 	%argrw{"wrr"}
	sin		result x 	%argrw{"wr"}
	add		result result $tmp1 	%argrw{"wrr"}
	end
)";

constexpr int kSamples = 1 << 20;
constexpr int kThreads = 16;

struct Sample {
    float result, deriv;
};

// Shades samples [begin, end) of the grid on its own context.
void shadeRange(ShadingSystem& ss, ShaderGroup& g, int begin, int end, std::vector<Sample>& out) {
    PerThreadInfo* ti = ss.create_thread_info();
    ShadingContext* ctx = ss.get_context(ti);
    const ShaderSymbol* result = ss.find_symbol(g, ustring("down.result"));
    const ShaderSymbol* deriv = ss.find_symbol(g, ustring("d.d"));
    for (int i = begin; i < end; ++i) {
        ShaderGlobals sg = globalsAt(float(i % 1024) / 1024.0f, float(i / 1024) / 1024.0f);
        ss.execute(*ctx, g, 0, sg);
        out[size_t(i)] = {*static_cast<const float*>(ss.symbol_address(*ctx, result)),
                          *static_cast<const float*>(ss.symbol_address(*ctx, deriv))};
    }
    ss.release_context(ctx);
    ss.destroy_thread_info(ti);
}

TEST(ShadingConcurrency, SixteenThreadsMatchOneThread) {
    CollectingHandler handler;
    ShadingSystem ss(nullptr, nullptr, &handler);
    ASSERT_TRUE(ss.LoadMemoryCompiledShader("derivs", kDerivsOso));
    ASSERT_TRUE(ss.LoadMemoryCompiledShader("mixer", kMixerOso));
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ASSERT_TRUE(ss.Shader(*g, "surface", "derivs", "d"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "mixer", "down"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "d", "d", "down", "x"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    ustring outputs[] = {ustring("d.d"), ustring("result")};
    ASSERT_TRUE(ss.attribute(g.get(), "renderer_outputs", TypeDesc(TypeDesc::STRING, 2), outputs));

    std::vector<Sample> serial(kSamples), parallel(kSamples);
    shadeRange(ss, *g, 0, kSamples, serial);
    std::vector<std::thread> pool;
    for (int t = 0; t < kThreads; ++t)
        pool.emplace_back(shadeRange, std::ref(ss), std::ref(*g), kSamples * t / kThreads,
                          kSamples * (t + 1) / kThreads, std::ref(parallel));
    for (std::thread& th : pool) th.join();

    int mismatches = 0;
    for (int i = 0; i < kSamples; ++i)
        if (std::memcmp(&serial[size_t(i)], &parallel[size_t(i)], sizeof(Sample)) != 0)
            ++mismatches;
    EXPECT_EQ(mismatches, 0);
    // Spot checks that the values are the shader's, not zeros.
    const float x = 2.0f * 0.5f * 0.1f; // d = Dx(u * u) at u = 0.5
    EXPECT_FLOAT_EQ(serial[512].result, x * x + std::sin(x));
    EXPECT_NEAR(serial[512].deriv, 2.0f * 0.5f * 0.1f, 1e-6f);
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
    EXPECT_TRUE(handler.messages.empty()) << handler.messages;
}

} // namespace
