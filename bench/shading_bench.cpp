// Shading throughput of the interpreter: one reference-compiled shader executed over a grid, on
// one thread and on all of them, as `testshade -g 512 512` would run it.
#include <OSL/oslexec.h>

#include <OpenImageIO/filesystem.h>

#include <benchmark/benchmark.h>

#include <cstring>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace OSL;

// A shader of the conformance suite with arithmetic, trigonometry, branches and derivatives.
const char* kShader = "andor-reg/oso-ref/a_float_u_b_float_u.oso";

struct Fixture {
    ShadingSystem ss;
    ShaderGroupRef group;
    bool ok = false;

    Fixture() {
        std::string oso;
        const std::string path =
            std::string(TESSEL_SOURCE_DIR) + "/../shared/osl-conformance/testsuite/" + kShader;
        if (!OIIO::Filesystem::read_text_file(path, oso)) return;
        if (!ss.LoadMemoryCompiledShader("bench", oso)) return;
        group = ss.ShaderGroupBegin("");
        ss.Shader(*group, "surface", "bench", "layer");
        ok = ss.ShaderGroupEnd(*group);
    }
};

Fixture& fixture() {
    static Fixture f;
    return f;
}

void shadeRows(Fixture& f, int res, int y0, int y1) {
    PerThreadInfo* ti = f.ss.create_thread_info();
    ShadingContext* ctx = f.ss.get_context(ti);
    ShaderGlobals sg;
    for (int y = y0; y < y1; ++y)
        for (int x = 0; x < res; ++x) {
            std::memset(static_cast<void*>(&sg), 0, sizeof sg);
            sg.u = float(x) / float(res - 1);
            sg.v = float(y) / float(res - 1);
            sg.dudx = sg.dvdy = 1.0f / float(res - 1);
            sg.P = Vec3(sg.u, sg.v, 1.0f);
            sg.dPdx = Vec3(sg.dudx, 0.0f, 0.0f);
            sg.dPdy = Vec3(0.0f, sg.dvdy, 0.0f);
            sg.N = sg.Ng = Vec3(0.0f, 0.0f, 1.0f);
            sg.raytype = 1;
            f.ss.execute(*ctx, *f.group, 0, sg);
        }
    f.ss.release_context(ctx);
    f.ss.destroy_thread_info(ti);
}

void BM_Grid512OneThread(benchmark::State& state) {
    Fixture& f = fixture();
    if (!f.ok) {
        state.SkipWithError("benchmark shader not found");
        return;
    }
    for (auto _ : state) shadeRows(f, 512, 0, 512);
    state.SetItemsProcessed(state.iterations() * 512 * 512);
}
BENCHMARK(BM_Grid512OneThread)->Unit(benchmark::kMillisecond);

void BM_Grid512AllThreads(benchmark::State& state) {
    Fixture& f = fixture();
    if (!f.ok) {
        state.SkipWithError("benchmark shader not found");
        return;
    }
    const int n = int(std::max(1u, std::thread::hardware_concurrency()));
    for (auto _ : state) {
        std::vector<std::thread> pool;
        for (int t = 0; t < n; ++t)
            pool.emplace_back(shadeRows, std::ref(f), 512, 512 * t / n, 512 * (t + 1) / n);
        for (std::thread& th : pool) th.join();
    }
    state.SetItemsProcessed(state.iterations() * 512 * 512);
}
BENCHMARK(BM_Grid512AllThreads)->Unit(benchmark::kMillisecond)->UseRealTime();

} // namespace

BENCHMARK_MAIN();
