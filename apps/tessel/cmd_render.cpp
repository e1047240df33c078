// `tessel render`: renders a scene file, or the built-in scene, to an image with a progress bar.
#include "command_registry.h"

#include <trelm/render/renderer.h>
#include <trelm/scene/scene_file.h>

#include <chrono>
#include <cstdio>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

namespace {

struct RenderOptions {
    std::string scene;
    std::string output = "render.png";
    int threads = 0;
    std::vector<int> size;
};

void DrawProgress(int done, int total) {
    constexpr int width = 40;
    const int filled = total > 0 ? done * width / total : width;
    std::string bar(size_t(filled), '#');
    bar.append(size_t(width - filled), '-');
    std::fprintf(stderr, "\rRendering [%s] %3d%%", bar.c_str(),
                 total > 0 ? done * 100 / total : 100);
    std::fflush(stderr);
}

int RunRender(const RenderOptions& opt) {
    std::unique_ptr<TrelmSDK::Scene> scene;
    if (opt.scene.empty()) {
        scene = TrelmSDK::MakeBuiltinScene();
    } else {
        std::string error;
        scene = TrelmSDK::LoadSceneFile(opt.scene, error);
        if (!scene) {
            std::cerr << "tessel render: " << error << "\n";
            return 1;
        }
    }
    if (!opt.size.empty()) {
        if (opt.size.size() != 2 || opt.size[0] < 1 || opt.size[1] < 1 || opt.size[0] > 16384 ||
            opt.size[1] > 16384) {
            std::cerr << "tessel render: --size needs a width and a height from 1 to 16384\n";
            return 1;
        }
        scene->settings.width = opt.size[0];
        scene->settings.height = opt.size[1];
    }

    TrelmSDK::Renderer renderer(opt.threads);
    TrelmSDK::RenderImage image;
    std::string error;
    const auto start = std::chrono::steady_clock::now();
    int lastDrawn = -1;
    const bool ok = renderer.Render(
        *scene, image,
        [&](int done, int total) {
            if (done != lastDrawn) DrawProgress(done, total);
            lastDrawn = done;
            return true;
        },
        error);
    std::fprintf(stderr, "\n");
    if (!ok) {
        std::cerr << "tessel render: " << error << "\n";
        return 1;
    }
    const double seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    if (!image.Write(opt.output, error)) {
        std::cerr << "tessel render: " << error << "\n";
        return 1;
    }
    std::cout << "Rendered " << image.width << " x " << image.height << " on " << renderer.Threads()
              << " threads in " << seconds << " s: " << opt.output << "\n";
    return 0;
}

const tessel_cli::CommandRegistrar registrar{
    "render", "Render a scene file (or the built-in scene) to an image",
    [](CLI::App& sub) -> std::function<int()> {
        auto opt = std::make_shared<RenderOptions>();
        sub.add_option("scene", opt->scene, "Scene file (JSON); the built-in scene without one");
        sub.add_option("-o,--output", opt->output, "Image to write")->capture_default_str();
        sub.add_option("--threads", opt->threads, "Render threads (0: all cores)")
            ->capture_default_str();
        sub.add_option("--size", opt->size, "Output width and height in pixels")
            ->expected(2)
            ->type_name("W H");
        return [opt] { return RunRender(*opt); };
    }};

} // namespace
