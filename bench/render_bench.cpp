// Camera rays per second through the built-in scene with a bitmap map on the sphere.
#include <trelm/render/renderer.h>
#include <trelm/scene/scene_file.h>

#include <benchmark/benchmark.h>

#include <string>

namespace {

const std::string kTexture = std::string(TESSEL_SOURCE_DIR) + "/examples/textures/tiles.png";

void RenderBuiltin(benchmark::State& state) {
    auto scene = TrelmSDK::MakeBuiltinScene(kTexture);
    scene->settings.width = 320;
    scene->settings.height = 240;
    TrelmSDK::Renderer renderer(int(state.range(0)));
    TrelmSDK::RenderImage image;
    std::string error;
    if (!renderer.Prepare(*scene, error)) {
        state.SkipWithError(error.c_str());
        return;
    }
    for (auto _ : state) {
        if (!renderer.RenderPrepared(image, nullptr, error)) {
            state.SkipWithError(error.c_str());
            return;
        }
        benchmark::DoNotOptimize(image.pixels.data());
    }
    const double rays = double(scene->settings.width) * scene->settings.height;
    state.counters["camera_rays/s"] =
        benchmark::Counter(rays * double(state.iterations()), benchmark::Counter::kIsRate);
    state.counters["threads"] = renderer.Threads();
}

} // namespace

// 1 thread, then all hardware threads (0).
BENCHMARK(RenderBuiltin)->Arg(1)->Arg(0)->Unit(benchmark::kMillisecond)->UseRealTime();

BENCHMARK_MAIN();
