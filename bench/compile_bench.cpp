// Compile time of the OSL compiler: the largest shaders of the conformance corpus from source to
// OSO text, and a generated shader at growing sizes to show that time grows linearly with source.
#include <OSL/oslcomp.h>

#include <OpenImageIO/filesystem.h>

#include <benchmark/benchmark.h>

#include <string>
#include <vector>

namespace {

using namespace OSL;

const std::string kSuite = std::string(TESSEL_SOURCE_DIR) + "/../shared/osl-conformance/testsuite/";

// Silent handler: the benchmark fails loudly instead if a compile does not succeed.
class QuietHandler final : public OIIO::ErrorHandler {
public:
    void operator()(int, const std::string&) override {}
};

bool compileOnce(const std::string& source, const std::string& file, const std::string& dir,
                 std::string& oso) {
    QuietHandler handler;
    OSLCompiler compiler(&handler);
    const std::vector<std::string> options{"-I" + dir};
    return compiler.compile_buffer(source, oso, options, {}, file);
}

void compileCorpusShader(benchmark::State& state, const char* relative) {
    const std::string path = kSuite + relative;
    std::string source;
    if (!OIIO::Filesystem::read_text_file(path, source)) {
        state.SkipWithError(("cannot read " + path).c_str());
        return;
    }
    const std::string dir = OIIO::Filesystem::parent_path(path);
    std::string oso;
    for (auto _ : state) {
        oso.clear();
        if (!compileOnce(source, path, dir, oso)) {
            state.SkipWithError(("failed to compile " + path).c_str());
            return;
        }
        benchmark::DoNotOptimize(oso.data());
    }
    state.SetBytesProcessed(int64_t(state.iterations()) * int64_t(source.size()));
    state.counters["oso_bytes"] = double(oso.size());
}

// A shader with `blocks` repetitions of a mixed block: declarations, arithmetic, calls into the
// standard library, a loop, a conditional and a user function call.
std::string generatedShader(int blocks) {
    std::string src = "float bump(float x, float k) { return x * k + sin(x); }\n"
                      "shader gen(float Kd = 0.5, color tint = color(1, 0.5, 0.25),\n"
                      "           output color Cout = 0) {\n"
                      "    color acc = 0;\n";
    for (int i = 0; i < blocks; ++i) {
        const std::string n = std::to_string(i);
        src += "    {\n"
               "        float a" +
               n + " = noise(P * " + n +
               ".5) * Kd;\n"
               "        vector v" +
               n + " = normalize(vector(u, v, a" + n +
               " + 1));\n"
               "        for (int j = 0; j < 3; ++j)\n"
               "            a" +
               n + " += bump(dot(v" + n +
               ", N), float(j));\n"
               "        if (a" +
               n +
               " > 0.5)\n"
               "            acc += tint * smoothstep(0, 1, a" +
               n +
               ");\n"
               "        else\n"
               "            acc -= mix(tint, color(a" +
               n +
               "), 0.25);\n"
               "    }\n";
    }
    src += "    Cout = acc;\n}\n";
    return src;
}

void BM_CompileGenerated(benchmark::State& state) {
    const int blocks = int(state.range(0));
    const std::string source = generatedShader(blocks);
    std::string oso;
    for (auto _ : state) {
        oso.clear();
        if (!compileOnce(source, "generated.osl", ".", oso)) {
            state.SkipWithError("failed to compile the generated shader");
            return;
        }
        benchmark::DoNotOptimize(oso.data());
    }
    state.SetComplexityN(blocks);
    state.SetBytesProcessed(int64_t(state.iterations()) * int64_t(source.size()));
}

} // namespace

BENCHMARK_CAPTURE(compileCorpusShader, derivs, "derivs/test.osl")->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(compileCorpusShader, trig, "trig/test.osl")->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(compileCorpusShader, geomath, "geomath/test.osl")->Unit(benchmark::kMillisecond);
BENCHMARK(BM_CompileGenerated)
    ->RangeMultiplier(4)
    ->Range(4, 256)
    ->Unit(benchmark::kMillisecond)
    ->Complexity(benchmark::oN);

BENCHMARK_MAIN();
