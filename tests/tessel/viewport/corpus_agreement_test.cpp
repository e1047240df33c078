// Reference shaders of the conformance corpus through the whole viewport path (translation,
// the HLSL library, a Vulkan device) against the CPU shading system on the same shading
// globals: the colours a viewport shows must be the render's. Skipped without a Vulkan device.
#include "cpu_reference.h"
#include "hlsl_evaluate.h"
#include "translate_support.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>

namespace {

using viewport_test::Float4;

std::string ReadFile(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

// Default values of the OSO's parameters, by name, as HLSL literals (floats, ints, triples).
std::map<std::string, std::string> ParameterDefaults(const std::string& oso) {
    std::map<std::string, std::string> defaults;
    std::istringstream lines(oso);
    std::string line;
    while (std::getline(lines, line)) {
        if (line.rfind("param\t", 0) != 0) continue;
        std::istringstream fields(line);
        std::string kind, type, name;
        std::getline(fields, kind, '\t');
        std::getline(fields, type, '\t');
        std::getline(fields, name, '\t');
        std::string values;
        std::getline(fields, values, '\t');
        if (type == "float" || type == "int")
            defaults[name] = "(" + values + ")";
        else if (type == "color" || type == "point" || type == "vector" || type == "normal") {
            std::string text = values;
            for (char& c : text)
                if (c == ' ') c = ',';
            defaults[name] = "float3(" + text + ")";
        }
    }
    return defaults;
}

struct Output {
    std::string name; // in the OSO
    int width = 1;    // 1 or 3 floats
};

// Points a comparison leaves out: where a shader uses what the viewport only approximates.
using Exclusion = bool (*)(float u, float v);

// Runs one corpus shader over a grid of (u, v) with P = (u, v, 1) and N = Ng = I = (0, 0, 1)
// on the device and on the CPU; counts the values that differ by more than `tolerance`.
void CheckShader(const std::string& relative, float tolerance, bool& ran,
                 Exclusion excluded = nullptr) {
    SCOPED_TRACE(relative);
    const std::filesystem::path path =
        std::filesystem::path(TESSEL_SHARED_DIR) / "osl-conformance" / "testsuite" / relative;
    if (!std::filesystem::exists(path)) return;
    const std::string oso = ReadFile(path);
    const auto translation = viewport_test::Translate(oso);
    ASSERT_TRUE(translation.ok) << translation.text;
    viewport_test::GeneratedFunction function;
    ASSERT_TRUE(viewport_test::ParseGenerated(translation.text, function)) << translation.text;

    const auto defaults = ParameterDefaults(oso);
    std::vector<Output> outputs;
    std::string call = "        " + function.name + "(", locals;
    for (const auto& p : function.parameters) {
        ASSERT_TRUE(p.array.empty()) << p.name;
        const std::string oslName = p.name.substr(0, p.name.size() - 1); // drops the '_'
        if (!call.ends_with("(")) call += ", ";
        if (p.out) {
            ASSERT_TRUE(p.type == "float" || p.type == "float3") << p.type;
            outputs.push_back({oslName, p.type == "float" ? 1 : 3});
            locals += "        " + p.type + " out" + std::to_string(outputs.size() - 1) + ";\n";
            call += "out" + std::to_string(outputs.size() - 1);
        } else {
            ASSERT_TRUE(defaults.count(oslName)) << oslName;
            call += "(" + p.type + ")" + defaults.at(oslName);
        }
    }
    call += ");\n";
    ASSERT_FALSE(outputs.empty());

    const int side = 24;
    const size_t n = size_t(side) * side, m = outputs.size();
    std::vector<Float4> buffer(n * m);
    for (int y = 0; y < side; ++y)
        for (int x = 0; x < side; ++x)
            buffer.push_back({(float(x) + 0.5f) / side, (float(y) + 0.5f) / side, 0.0f, 0.0f});
    std::string body = "[numthreads(1, 1, 1)]\nvoid main()\n{\n    [loop] for (uint i = 0; i < " +
                       std::to_string(n) + "; ++i) {\n        float4 q = ksg_test_result[" +
                       std::to_string(n * m) +
                       " + i];\n"
                       "        state.position = float3(q.x, q.y, 1.0);\n"
                       "        state.normal = float3(0.0, 0.0, 1.0);\n"
                       "        state.geom_normal = float3(0.0, 0.0, 1.0);\n"
                       "        state.direction = float3(0.0, 0.0, 1.0);\n"
                       "        state.tex_coord[0] = float3(q.x, q.y, 0.0);\n" +
                       locals + call;
    for (size_t k = 0; k < m; ++k)
        body += "        ksg_test_result[" + std::to_string(k * n) + " + i] = float4(out" +
                std::to_string(k) + (outputs[k].width == 1 ? ", 0.0, 0.0" : "") + ", 0.0);\n";
    body += "    }\n}\n";
    std::string error;
    const std::string shader =
        TrelmSDK::Graphics::ksg::AssembleLibraryEntry(function.includes, function.text, error) +
        "\n" + viewport_test::kEvaluationResultDeclaration + body;
    ASSERT_TRUE(error.empty()) << error;
    const auto gpu = viewport_test::EvaluateHLSL(shader, buffer.size(), buffer);
    if (!gpu.available) return;
    ran = true;
    ASSERT_TRUE(gpu.ok) << gpu.error.substr(0, 3000);

    viewport_test::MessageLog log;
    OSL::ShadingSystem system(nullptr, nullptr, &log);
    ASSERT_TRUE(system.LoadMemoryCompiledShader("corpus", oso)) << log.text;
    OSL::ShaderGroupRef group = system.ShaderGroupBegin("");
    ASSERT_TRUE(system.Shader(*group, "surface", "corpus", "layer"));
    ASSERT_TRUE(system.ShaderGroupEnd(*group)) << log.text;
    OSL::PerThreadInfo* thread = system.create_thread_info();
    OSL::ShadingContext* context = system.get_context(thread);
    size_t differing = 0, compared = 0;
    float worst = 0.0f;
    std::string first;
    for (size_t i = 0; i < n; ++i) {
        const Float4& q = buffer[n * m + i];
        if (excluded && excluded(q[0], q[1])) continue;
        OSL::ShaderGlobals globals;
        std::memset(static_cast<void*>(&globals), 0, sizeof globals);
        globals.u = q[0];
        globals.v = q[1];
        globals.P = OSL::Vec3(q[0], q[1], 1.0f);
        globals.N = globals.Ng = globals.I = OSL::Vec3(0.0f, 0.0f, 1.0f);
        ASSERT_TRUE(system.execute(*context, *group, 0, globals)) << log.text;
        for (size_t k = 0; k < m; ++k) {
            const OSL::ShaderSymbol* symbol =
                system.find_symbol(*group, OSL::ustring(outputs[k].name));
            ASSERT_NE(symbol, nullptr) << outputs[k].name;
            const float* cpu = static_cast<const float*>(system.symbol_address(*context, symbol));
            ASSERT_NE(cpu, nullptr);
            for (int c = 0; c < outputs[k].width; ++c, ++compared) {
                const float got = gpu.values[k * n + i][c];
                const float diff = std::fabs(got - cpu[c]);
                worst = std::max(worst, diff);
                if (!(diff <= tolerance) && differing++ == 0) {
                    char text[200];
                    std::snprintf(text, sizeof text, "%s[%d] at u %g v %g: gpu %.9g cpu %.9g",
                                  outputs[k].name.c_str(), c, q[0], q[1], got, cpu[c]);
                    first = text;
                }
            }
        }
    }
    system.release_context(context);
    system.destroy_thread_info(thread);
    std::printf("[ corpus ] %-45s %zu of %zu values differ by more than %g, max difference %g\n",
                relative.c_str(), differing, compared, double(tolerance), double(worst));
    std::fflush(stdout);
    EXPECT_EQ(differing, 0u) << "first: " << first;
}

// The tolerance is what a viewport can show (a tenth of an 8-bit step): the translated
// arithmetic around the library calls follows the generator's own rounding.
constexpr float kVisible = 0.1f / 255.0f;

TEST(CorpusAgreement, SpectralAndPeriodicNoiseShadersShowTheRendersColours) {
    bool ran = false;
    for (const char* shader : {"wavelength_color/oso-ref/test.oso", "pnoise/oso-ref/test.oso"})
        CheckShader(shader, kVisible, ran);
    if (!ran) GTEST_SKIP() << "no Vulkan device to run HLSL, or no reference corpus";
}

// The regression shaders draw Gabor noise in one block (u in (0.51, 0.74), v > 0.51), which the
// viewport approximates with Perlin noise; every other block must agree.
bool GaborBlock(float u, float v) {
    return u > 0.51f && u < 0.74f && v > 0.51f;
}

TEST(CorpusAgreement, NoiseRegressionShadersShowTheRendersColoursOutsideGabor) {
    bool ran = false;
    for (const char* shader :
         {"noise-reg/oso-ref/test_noise_3d_v.oso", "pnoise-reg/oso-ref/test_pnoise_3d_v_v.oso"})
        CheckShader(shader, kVisible, ran, GaborBlock);
    if (!ran) GTEST_SKIP() << "no Vulkan device to run HLSL, or no reference corpus";
}

// The generic periodic noise picks its noise by row, int(14 v) % 7: row 2 is Gabor noise, and
// row 6 hash noise, whose 3D and 4D columns hash a coordinate divided by sqrt(2) (see below).
bool GaborRowAndDividedHash(float u, float v) {
    const int row = int(v * 14.0f) % 7;
    return row == 2 || (row == 6 && u > 0.5f);
}

TEST(CorpusAgreement, GenericPeriodicNoiseShowsTheRendersColoursOutsideGabor) {
    bool ran = false;
    CheckShader("pnoise-generic/oso-ref/test.oso", kVisible, ran, GaborRowAndDividedHash);
    if (!ran) GTEST_SKIP() << "no Vulkan device to run HLSL, or no reference corpus";
}

// Hash noise of coordinates computed from constants such as 0.984807729721069335: any rounding
// of a constant in the generated code gives an unrelated pattern. The 3D and 4D columns
// (u > 0.5) hash a coordinate divided by sqrt(2), and Vulkan lets a device divide within 2.5 ulp,
// so those columns can only agree on devices that divide exactly.
bool DividedColumns(float u, float) {
    return u > 0.5f;
}

TEST(CorpusAgreement, HashNoiseShader) {
    bool ran = false;
    CheckShader("hashnoise/oso-ref/test.oso", kVisible, ran, DividedColumns);
    if (!ran) GTEST_SKIP() << "no Vulkan device to run HLSL, or no reference corpus";
}

} // namespace
