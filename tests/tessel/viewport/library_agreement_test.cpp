// The viewport HLSL library against the CPU shading system: each library function runs on a
// Vulkan device over a grid of inputs and is compared with the same OSL call shaded on the CPU,
// which is the truth the viewport must show. Skipped where no Vulkan device exists.
#include "cpu_reference.h"
#include "hlsl_evaluate.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdio>
#include <random>

namespace {

using viewport_test::CpuReference;
using viewport_test::Float4;

struct Sample {
    Float4 q{};           // the input: x, y, z, w
    Float4 t{1, 1, 1, 1}; // periods, for the periodic noises
};

// How far the viewport may be from the CPU: |gpu - cpu| <= absolute + relative * |cpu|.
// Both zero asks for the same bits.
struct Tolerance {
    float absolute = 0.0f;
    float relative = 0.0f;
};

struct Case {
    std::string name; // the library function
    std::string hlsl; // a float3 expression of float4 q and float4 t
    std::string osl;  // statements that set color r from x, y, z, w, p and tx..tw, t
    // On a hardware GPU, which may fuse multiply-adds and divides approximately.
    Tolerance tolerance;
    // On a CPU device (lavapipe) every operation rounds as written, so the library, which
    // follows the CPU's formulas in the CPU's order, must give the CPU's bits.
    bool exactOnCpuDevice = true;
};

// Cases that share their samples.
struct Family {
    std::vector<Sample> samples;
    std::vector<Case> cases;
};

// A shader that runs one case over n samples: sample i (q, t) waits in elements n + 2 i and
// n + 2 i + 1 of the buffer, its result goes to element i. Each case is a shader of its own: the
// device's compiler inlines everything, and one large shader costs it more than several small.
std::string CaseShader(size_t samples, const Case& k) {
    const std::string n = std::to_string(samples);
    const std::string body = "[numthreads(1, 1, 1)]\nvoid main()\n{\n"
                             "    [loop] for (uint i = 0; i < " +
                             n +
                             "; ++i) {\n"
                             "        float4 q = ksg_test_result[" +
                             n +
                             " + 2 * i];\n"
                             "        float4 t = ksg_test_result[" +
                             n +
                             " + 2 * i + 1];\n"
                             "        ksg_test_result[i] = float4(" +
                             k.hlsl +
                             ", 0.0);\n"
                             "    }\n}\n";
    std::string error;
    const std::string library = TrelmSDK::Graphics::ksg::AssembleLibraryEntry(
        {"include:ksg_noise.h", "include:ksg_util.h"}, "", error);
    EXPECT_TRUE(error.empty()) << error;
    return library + "\n" + viewport_test::kEvaluationResultDeclaration + body;
}

// The buffer the case shaders start from: room for the results, then the samples. The inputs
// travel as floats in memory, so the device sees exactly the CPU's bits.
std::vector<Float4> InitialBuffer(const std::vector<Sample>& samples) {
    std::vector<Float4> buffer(samples.size());
    for (const Sample& s : samples) {
        buffer.push_back(s.q);
        buffer.push_back(s.t);
    }
    return buffer;
}

std::string Describe(const Sample& s) {
    char text[200];
    std::snprintf(text, sizeof text, "q = (%.9g, %.9g, %.9g, %.9g) t = (%.9g, %.9g, %.9g, %.9g)",
                  s.q[0], s.q[1], s.q[2], s.q[3], s.t[0], s.t[1], s.t[2], s.t[3]);
    return text;
}

// Runs the family on the device and on the CPU and checks every case; false when there is no
// device. Prints the largest difference of each case.
bool CheckFamily(const Family& family) {
    const size_t n = family.samples.size();
    const std::vector<Float4> initial = InitialBuffer(family.samples);
    for (const Case& k : family.cases) {
        const viewport_test::Evaluation gpu =
            viewport_test::EvaluateHLSL(CaseShader(n, k), initial.size(), initial);
        if (!gpu.available) return false;
        EXPECT_TRUE(gpu.ok) << k.name << ": " << gpu.error.substr(0, 4000);
        if (!gpu.ok) continue;
        CpuReference cpu(k.osl);
        EXPECT_EQ(cpu.Error(), "") << k.name;
        if (!cpu.Error().empty()) continue;
        const Tolerance allowed = gpu.cpuDevice && k.exactOnCpuDevice ? Tolerance{} : k.tolerance;
        float worstAbsolute = 0.0f, worstRelative = 0.0f;
        size_t worstAt = 0, failures = 0;
        std::string firstFailure;
        for (size_t i = 0; i < n; ++i) {
            std::array<float, 3> expected;
            if (!cpu.Run(family.samples[i].q, family.samples[i].t, expected)) {
                ADD_FAILURE() << k.name << ": " << cpu.Error();
                break;
            }
            const Float4& got = gpu.values[i];
            for (int ch = 0; ch < 3; ++ch) {
                const float e = expected[ch], g = got[ch];
                const bool same = std::bit_cast<uint32_t>(e) == std::bit_cast<uint32_t>(g) ||
                                  (e == 0.0f && g == 0.0f);
                const float diff = same ? 0.0f : std::fabs(g - e);
                const float relative = diff / std::max(std::fabs(e), 1e-30f);
                if (!(diff <= worstAbsolute)) worstAbsolute = diff, worstAt = i;
                if (std::isfinite(relative) && std::fabs(e) > 1e-6f)
                    worstRelative = std::max(worstRelative, relative);
                const bool within =
                    same || diff <= allowed.absolute + allowed.relative * std::fabs(e);
                if (!within && failures++ == 0) {
                    char text[160];
                    std::snprintf(text, sizeof text, " channel %d: gpu %.9g cpu %.9g", ch, g, e);
                    firstFailure = Describe(family.samples[i]) + text;
                }
            }
        }
        std::printf("[ agreement ] %-20s max |gpu - cpu| %-12.4g max relative %-12.4g at %s\n",
                    k.name.c_str(), double(worstAbsolute), double(worstRelative),
                    Describe(family.samples[worstAt]).c_str());
        std::fflush(stdout);
        EXPECT_EQ(failures, 0u) << k.name << ": " << failures << " values outside the tolerance; "
                                << "first at " << firstFailure;
    }
    return true;
}

// ---- inputs ----

// Points for the lattice noises: integer lattice points, fractions on both sides of zero,
// points just beside lattice planes, far-away and huge coordinates, and signed zeros.
std::vector<Sample> NoiseSamples() {
    std::vector<Sample> samples;
    const float lattice[] = {-3, -2, -1, 0, 1, 2, 5};
    for (int i = 0; i < 7; ++i)
        for (int j = 0; j < 7; j += 2)
            samples.push_back(
                {{lattice[i], lattice[j], lattice[(i + j) % 7], lattice[(i * j) % 7]}});
    std::mt19937 random(20261206u);
    std::uniform_real_distribution<float> near(-6.0f, 6.0f);
    for (int i = 0; i < 120; ++i)
        samples.push_back({{near(random), near(random), near(random), near(random)}});
    const float beside[] = {-1.0001f, -0.9999f, -1e-4f, 1e-4f, 0.9999f, 2.0001f, 0.5f, -0.5f};
    for (int i = 0; i < 8; ++i)
        samples.push_back({{beside[i], beside[(i + 3) % 8], beside[(i + 5) % 8], beside[7 - i]}});
    const float far[] = {1000.25f,    -4321.7f,    65536.5f, -123456.78f, 1048575.75f,
                         -8388607.5f, 16777216.0f, 3.0e8f,   -1.0e9f,     777.777f};
    for (int i = 0; i < 10; ++i)
        samples.push_back(
            {{far[i], far[(i + 1) % 10] * 0.5f, -far[(i + 4) % 10], far[(i + 7) % 10]}});
    samples.push_back({{-0.0f, 0.0f, -0.0f, 0.0f}});
    samples.push_back({{0.0f, -0.0f, 1e-30f, -1e-30f}});
    return samples;
}

// The noise samples again, each with periods from a set that has whole, fractional (floored)
// and below-one (raised to one) periods.
std::vector<Sample> PeriodicSamples() {
    const Float4 periods[] = {{1, 1, 1, 1}, {2, 3, 4, 5},      {7, 0.5f, 2.5f, 16},
                              {3, 3, 3, 3}, {256, 5, 1.9f, 4}, {0.25f, 10, 6, 2}};
    std::vector<Sample> samples = NoiseSamples();
    for (size_t i = 0; i < samples.size(); ++i) samples[i].t = periods[i % 6];
    return samples;
}

// Colours inside and outside [0,1], greys, primaries and hues on sector boundaries.
std::vector<Sample> ColourSamples() {
    std::vector<Sample> samples;
    const float levels[] = {0.0f,        1.0f / 6.0f, 0.25f,       1.0f / 3.0f, 0.5f,
                            2.0f / 3.0f, 0.75f,       5.0f / 6.0f, 1.0f};
    for (float a : levels)
        for (float b : {0.0f, 0.3f, 1.0f})
            for (float c : {0.0f, 0.6f, 1.0f}) samples.push_back({{a, b, c, 0}});
    std::mt19937 random(6122026u);
    std::uniform_real_distribution<float> unit(0.0f, 1.0f), wide(-0.5f, 1.5f);
    for (int i = 0; i < 80; ++i) samples.push_back({{unit(random), unit(random), unit(random), 0}});
    for (int i = 0; i < 40; ++i) samples.push_back({{wide(random), wide(random), wide(random), 0}});
    samples.push_back({{-0.0f, 0.2f, 0.2f, 0}});
    samples.push_back({{2.5f, 0.5f, 0.5f, 0}});
    return samples;
}

std::vector<Sample> Line(float from, float to, float step, std::initializer_list<float> extra) {
    std::vector<Sample> samples;
    for (float x = from; x <= to; x += step) samples.push_back({{x, 0, 0, 0}});
    for (float x : extra) samples.push_back({{x, 0, 0, 0}});
    return samples;
}

// ---- cases ----

const char* kHlslPosition[] = {"q.x", "q.xy", "q.xyz", "q"};
const char* kHlslPeriod[] = {"t.x", "t.xy", "t.xyz", "t"};
const char* kOslPosition[] = {"x", "x, y", "p", "p, w"};
const char* kOslPeriod[] = {"tx", "tx, ty", "t", "t, tw"};

// name_D_N for D = 1, 3 and N = 1..4. `hlslExtra` follows the position in the library call;
// `oslCall` is the OSL call with ARGS where the position goes.
std::vector<Case> NoiseCases(const std::string& name, const std::string& hlslExtra,
                             const std::string& oslCall, bool periodic, Tolerance tolerance) {
    std::vector<Case> cases;
    for (int d : {1, 3})
        for (int n = 1; n <= 4; ++n) {
            Case k;
            k.name = name + "_" + std::to_string(d) + "_" + std::to_string(n);
            std::string call = k.name + "(" + kHlslPosition[n - 1];
            if (periodic) call += std::string(", ") + kHlslPeriod[n - 1];
            call += hlslExtra + ")";
            k.hlsl = d == 1 ? "float3(" + call + ", 0.0, 0.0)" : call;
            std::string args = kOslPosition[n - 1];
            if (periodic) args += std::string(", ") + kOslPeriod[n - 1];
            std::string osl = oslCall;
            osl.replace(osl.find("ARGS"), 4, args);
            k.osl = d == 1 ? "float f = " + osl + "; r = color(f, 0, 0);"
                           : "vector res = " + osl + "; r = color(res[0], res[1], res[2]);";
            k.tolerance = tolerance;
            cases.push_back(k);
        }
    return cases;
}

Case Colour(const std::string& name, const std::string& hlsl, const std::string& osl,
            Tolerance tolerance, bool exactOnCpuDevice = true) {
    return {name, hlsl, osl, tolerance, exactOnCpuDevice};
}

// Perlin and simplex values lie within [-1,1] and take some thirty float operations; a GPU that
// fuses or reorders them moves each by a few units in the last place (6e-8 at 1), so 2e-6 bounds
// honest rounding while any change of gradient, corner or falloff shows far above it.
constexpr Tolerance kGradientNoise{2e-6f, 0.0f};
// Colour conversions are a handful of products and sums of values about 1.
constexpr Tolerance kColour{1e-6f, 1e-6f};

TEST(LibraryAgreement, CellAndHashNoiseHashLikeTheCpu) {
    Family family{NoiseSamples(), {}};
    for (auto cases : {NoiseCases("cellnoise", "", "cellnoise(ARGS)", false, {}),
                       NoiseCases("hashnoise", "", "hashnoise(ARGS)", false, {})})
        family.cases.insert(family.cases.end(), cases.begin(), cases.end());
    if (!CheckFamily(family)) GTEST_SKIP() << "no Vulkan device to run HLSL";
}

TEST(LibraryAgreement, PeriodicCellAndHashNoiseHashLikeTheCpu) {
    Family family{PeriodicSamples(), {}};
    for (auto cases : {NoiseCases("pcellnoise", "", "pnoise(\"cell\", ARGS)", true, {}),
                       NoiseCases("phashnoise", "", "pnoise(\"hash\", ARGS)", true, {})})
        family.cases.insert(family.cases.end(), cases.begin(), cases.end());
    if (!CheckFamily(family)) GTEST_SKIP() << "no Vulkan device to run HLSL";
}

TEST(LibraryAgreement, PerlinNoiseFollowsTheCpu) {
    Family family{NoiseSamples(),
                  NoiseCases("perlin", "", "noise(\"perlin\", ARGS)", false, kGradientNoise)};
    if (!CheckFamily(family)) GTEST_SKIP() << "no Vulkan device to run HLSL";
}

TEST(LibraryAgreement, PeriodicPerlinNoiseFollowsTheCpu) {
    Family family{PeriodicSamples(),
                  NoiseCases("pperlin", "", "psnoise(ARGS)", true, kGradientNoise)};
    if (!CheckFamily(family)) GTEST_SKIP() << "no Vulkan device to run HLSL";
}

TEST(LibraryAgreement, SimplexNoiseFollowsTheCpu) {
    Family family{NoiseSamples(), NoiseCases("simplexnoise", ", 0", "noise(\"simplex\", ARGS)",
                                             false, kGradientNoise)};
    if (!CheckFamily(family)) GTEST_SKIP() << "no Vulkan device to run HLSL";
}

TEST(LibraryAgreement, ColourSpaceConversionsFollowTheCpu) {
    Family family{ColourSamples(), {}};
    const std::pair<const char*, const char*> spaces[] = {
        {"hsv", "hsv"}, {"hsl", "hsl"}, {"YIQ", "YIQ"}, {"XYZ", "XYZ"}};
    for (const auto& [hlslName, oslName] : spaces) {
        family.cases.push_back(Colour(
            std::string(hlslName) + "_to_rgb", std::string(hlslName) + "_to_rgb(q.xyz)",
            std::string("r = transformc(\"") + oslName + "\", \"rgb\", color(x, y, z));", kColour));
        family.cases.push_back(Colour(
            std::string("rgb_to_") + hlslName, std::string("rgb_to_") + hlslName + "(q.xyz)",
            std::string("r = transformc(\"rgb\", \"") + oslName + "\", color(x, y, z));", kColour));
    }
    if (!CheckFamily(family)) GTEST_SKIP() << "no Vulkan device to run HLSL";
}

TEST(LibraryAgreement, SpectralColoursFollowTheCpu) {
    Family wavelengths{
        Line(350.0f, 800.0f, 2.5f, {379.99f, 380.0f, 380.01f, 779.99f, 780.0f, -5.0f, 1.0e6f}),
        {Colour("wavelength_color", "wavelength_color(q.x)", "r = wavelength_color(x);", kColour)}};
    if (!CheckFamily(wavelengths)) GTEST_SKIP() << "no Vulkan device to run HLSL";
    Family temperatures{
        Line(500.0f, 15000.0f, 250.0f,
             {0.0f, -100.0f, 799.9f, 800.0f, 800.1f, 801.0f, 1234.5f, 6504.0f, 11999.0f, 12000.0f,
              12001.0f, 25000.0f, 40000.0f}),
        // The CPU takes fifth roots with the C library's pow, the device with
        // its own (a few units in the last place); the fifth power of the
        // interpolated root multiplies that relative error by five.
        {Colour("blackbody_rgb", "blackbody_rgb(q.x)", "r = blackbody(x);", {0.0f, 1e-5f}, false)}};
    CheckFamily(temperatures);
}

TEST(LibraryAgreement, MathHelpersFollowTheCpu) {
    std::vector<Sample> powers;
    const float bases[] = {-3.0f,  -1.5f, -1.0f, -0.25f, -0.0f, 0.0f,
                           1e-20f, 0.2f,  1.0f,  2.0f,   7.5f};
    const float exponents[] = {0.0f, 1.0f,  2.0f,        3.0f, -1.0f,      0.5f,
                               2.2f, -2.5f, 1.0f / 2.4f, 4.0f, 16777218.0f};
    for (float b : bases)
        for (float e : exponents) powers.push_back({{b, e, 0, 0}});
    Family pow{powers,
               {Colour("safe_pow", "float3(safe_pow(q.x, q.y), 0.0, 0.0)",
                       "r = color(pow(x, y), 0, 0);", {1e-6f, 1e-5f})}};
    if (!CheckFamily(pow)) GTEST_SKIP() << "no Vulkan device to run HLSL";
    Family erf{Line(-5.0f, 5.0f, 0.0625f, {0.0f, -0.0f, 1e-8f, -1e-8f, 0.03f, 13.0f, -20.0f}),
               {Colour("fast_erf", "float3(fast_erf(q.x), 0.0, 0.0)", "r = color(erf(x), 0, 0);",
                       {1e-7f, 0.0f})}};
    CheckFamily(erf);
    Family expm1{
        Line(-20.0f, 20.0f, 0.25f,
             {0.0f, -0.0f, 1e-6f, -1e-6f, 1e-5f, 0.02f, -0.02f, 0.029f, 0.031f, -0.04f, 80.0f}),
        {Colour("fast_expm1", "float3(fast_expm1(q.x), 0.0, 0.0)", "r = color(expm1(x), 0, 0);",
                {1e-7f, 1e-6f})}};
    CheckFamily(expm1);
}

} // namespace
