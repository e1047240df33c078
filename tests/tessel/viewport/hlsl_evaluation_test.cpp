// Values of viewport code, run on a Vulkan device: the periodic noises of the viewport library
// and the generated text of select and periodic noise. Skipped where no Vulkan device exists.
#include "hlsl_evaluate.h"
#include "translate_support.h"

#include <gtest/gtest.h>

namespace {

using viewport_test::Evaluation;
using viewport_test::Float4;

// The viewport library with its includes, the given functions, the result buffer and a main
// that runs `body`.
std::string Shader(const std::vector<std::string>& includes, const std::string& functions,
                   const std::string& body) {
    std::string error;
    std::string shader = TrelmSDK::Graphics::ksg::AssembleLibraryEntry(includes, functions, error);
    EXPECT_TRUE(error.empty()) << error;
    return shader + "\n" + viewport_test::kEvaluationResultDeclaration +
           "[numthreads(1, 1, 1)]\nvoid main()\n{\n" + body + "}\n";
}

// Runs the shader; false (with the test skipped) when no device can run it.
bool RunShader(const std::string& shader, size_t count, std::vector<Float4>& values) {
    const Evaluation evaluation = viewport_test::EvaluateHLSL(shader, count);
    if (!evaluation.available) return false;
    EXPECT_TRUE(evaluation.ok) << evaluation.error;
    values = evaluation.values;
    return evaluation.ok;
}

// The function part of a text mode translation (without its include comment).
std::string FunctionText(const std::string& output) {
    const size_t start = output.find("void ");
    return start == std::string::npos ? output : output.substr(start);
}

TEST(HLSLEvaluation, PeriodicPerlinNoiseRepeatsAndMatchesPlainNoiseInsideAPeriod) {
    const std::string body =
        "    ksg_test_result[0] = float4(pperlin_1_1(1.3, 4.0), pperlin_1_1(5.3, 4.0),\n"
        "                                pperlin_1_1(-6.7, 4.0), perlin_1_1(1.3));\n"
        "    float3 p = float3(1.3, 2.2, 0.7), t = float3(3.0, 5.0, 2.0);\n"
        "    ksg_test_result[1] = float4(pperlin_1_3(p, t), pperlin_1_3(p + t * float3(1, -2, 3), "
        "t),\n"
        "                                perlin_1_3(p), pperlin_1_1(1.6, 4.0));\n"
        "    float4 q = float4(0.4, 1.7, 2.9, 0.2), s = float4(4.0, 3.0, 5.0, 2.0);\n"
        "    ksg_test_result[2] = float4(pperlin_3_4(q + s * float4(2, 1, -1, 3), s), 0.0);\n"
        "    ksg_test_result[3] = float4(pperlin_3_4(q, s), 0.0);\n"
        // A period below one acts as one.
        "    ksg_test_result[4] = float4(pperlin_1_1(0.3, 0.5), pperlin_1_1(1.3, 0.5),\n"
        "                                pperlin_1_1(0.3, 1.0), 0.0);\n";
    std::vector<Float4> r;
    if (!RunShader(Shader({"include:ksg_noise.h"}, "", body), 5, r))
        GTEST_SKIP() << "no Vulkan device to run HLSL";
    EXPECT_NEAR(r[0][0], r[0][1], 1e-5);
    EXPECT_NEAR(r[0][0], r[0][2], 1e-5);
    // Both lattice points of 1.3 lie inside the period, so nothing wraps there.
    EXPECT_NEAR(r[0][0], r[0][3], 1e-6);
    EXPECT_NE(r[0][0], 0.0f);
    EXPECT_NEAR(r[1][0], r[1][1], 1e-5);
    EXPECT_NEAR(r[1][0], r[1][2], 1e-6);
    EXPECT_NE(r[0][0], r[1][3]);
    for (int c = 0; c < 3; ++c) EXPECT_NEAR(r[2][c], r[3][c], 1e-5) << c;
    EXPECT_NE(r[3][0], r[3][1]);
    EXPECT_NEAR(r[4][0], r[4][1], 1e-5);
    EXPECT_EQ(r[4][0], r[4][2]);
}

TEST(HLSLEvaluation, PeriodicCellAndHashNoiseWrapTheirCoordinates) {
    const std::string body =
        "    float2 p = float2(1.5, 2.25), t = float2(3.0, 4.0);\n"
        "    ksg_test_result[0] = float4(pcellnoise_1_2(p, t), pcellnoise_1_2(p + t * 2.0, t),\n"
        "                                cellnoise_1_2(p), cellnoise_1_2(p + float2(1, 0)));\n"
        "    ksg_test_result[1] = float4(phashnoise_1_1(1.25, 1.0), hashnoise_1_1(0.25),\n"
        "                                phashnoise_1_1(0.25, 2.0), hashnoise_1_1(1.25));\n"
        "    ksg_test_result[2] = float4(pcellnoise_3_3(float3(7.5, 1, 1), float3(3, 3, 3)), 0);\n"
        "    ksg_test_result[3] = float4(cellnoise_3_3(float3(1.5, 1, 1)), 0);\n";
    std::vector<Float4> r;
    if (!RunShader(Shader({"include:ksg_noise.h"}, "", body), 4, r))
        GTEST_SKIP() << "no Vulkan device to run HLSL";
    EXPECT_EQ(r[0][0], r[0][1]);
    EXPECT_EQ(r[0][0], r[0][2]);
    EXPECT_NE(r[0][2], r[0][3]);
    EXPECT_EQ(r[1][0], r[1][1]);
    EXPECT_EQ(r[1][2], r[1][1]);
    EXPECT_NE(r[1][1], r[1][3]);
    for (int c = 0; c < 3; ++c) EXPECT_EQ(r[2][c], r[3][c]) << c;
}

TEST(HLSLEvaluation, GeneratedSelectPicksByItsCondition) {
    const std::string oso = viewport_test::OSO(
        "param\tfloat\ta\t1\nparam\tfloat\tb\t2\nparam\tint\ti\t1\n"
        "param\tcolor\tx\t0 0 0\nparam\tcolor\ty\t0 0 0\nparam\tcolor\tm\t0 0 0\n"
        "oparam\tfloat\tr\t0\noparam\tcolor\tc\t0 0 0\n",
        "code ___main___\n\tselect\tr a b i\n\tselect\tc x y m\n\tend\n");
    const auto t = viewport_test::Translate(oso);
    ASSERT_TRUE(t.ok) << t.text;
    const std::string body =
        "    float r0, r1; float3 c0, c1;\n"
        "    F(1.0, 2.0, 0, float3(1, 2, 3), float3(4, 5, 6), float3(0, 1, -1), r0, c0);\n"
        "    F(1.0, 2.0, 3, float3(1, 2, 3), float3(4, 5, 6), float3(0, 0, 0), r1, c1);\n"
        "    ksg_test_result[0] = float4(r0, r1, 0, 0);\n"
        "    ksg_test_result[1] = float4(c0, 0);\n"
        "    ksg_test_result[2] = float4(c1, 0);\n";
    std::vector<Float4> r;
    if (!RunShader(Shader({}, FunctionText(t.text), body), 3, r))
        GTEST_SKIP() << "no Vulkan device to run HLSL";
    EXPECT_EQ(r[0][0], 1.0f);
    EXPECT_EQ(r[0][1], 2.0f);
    EXPECT_EQ(r[1], (Float4{1, 5, 6, 0}));
    EXPECT_EQ(r[2], (Float4{1, 2, 3, 0}));
}

TEST(HLSLEvaluation, GeneratedPeriodicNoiseRepeatsOverItsPeriod) {
    const std::string oso = viewport_test::OSO(
        "param\tvector\tperiod\t2 3 4\noparam\tfloat\ts\t0\noparam\tfloat\tu\t0\n"
        "global\tpoint\tP\n",
        "code ___main___\n\tpsnoise\ts P period\n\tpnoise\tu P period\n\tend\n");
    const auto t = viewport_test::Translate(oso);
    ASSERT_TRUE(t.ok) << t.text;
    const std::string body = "    float s0, u0, s1, u1;\n"
                             "    state.position = float3(0.3, 1.6, 2.45);\n"
                             "    F(float3(2, 3, 4), s0, u0);\n"
                             "    state.position += float3(2, -3, 8);\n"
                             "    F(float3(2, 3, 4), s1, u1);\n"
                             "    ksg_test_result[0] = float4(s0, u0, s1, u1);\n";
    std::vector<Float4> r;
    if (!RunShader(Shader({"include:ksg_noise.h"}, FunctionText(t.text), body), 1, r))
        GTEST_SKIP() << "no Vulkan device to run HLSL";
    EXPECT_NEAR(r[0][0], r[0][2], 1e-5);
    EXPECT_NEAR(r[0][1], r[0][3], 1e-5);
    // pnoise is the unsigned form of psnoise.
    EXPECT_NEAR(r[0][1], 0.5f * r[0][0] + 0.5f, 1e-6);
    EXPECT_NE(r[0][0], 0.0f);
}

} // namespace
