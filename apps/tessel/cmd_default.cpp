// `tessel default`: the job the README runs. Until the module can render, it is the self-check:
// it exercises the libraries the build links and writes a small report and image.
#include "command_registry.h"

#include <trelm/core/time.h>

#include <OpenImageIO/imagebuf.h>
#include <OpenImageIO/imagebufalgo.h>
#include <OpenImageIO/oiioversion.h>
#include <QtCore/qglobal.h>

#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>

namespace {

int runSelfCheck(const std::filesystem::path& outDir) {
    std::error_code ec;
    std::filesystem::create_directories(outDir, ec);
    if (ec) {
        std::cerr << "tessel: cannot create " << outDir << ": " << ec.message() << "\n";
        return 1;
    }

    // A 64x64 UV ramp written through OpenImageIO proves image output works.
    OIIO::ImageSpec spec(64, 64, 3, OIIO::TypeDesc::UINT8);
    OIIO::ImageBuf ramp(spec);
    const float topLeft[] = {0, 0, 0}, topRight[] = {1, 0, 0};
    const float bottomLeft[] = {0, 1, 0}, bottomRight[] = {1, 1, 0};
    OIIO::ImageBufAlgo::fill(ramp, topLeft, topRight, bottomLeft, bottomRight);
    const auto image = outDir / "selfcheck.png";
    if (!ramp.write(image.string())) {
        std::cerr << "tessel: cannot write " << image << ": " << ramp.geterror() << "\n";
        return 1;
    }

    const auto report = outDir / "selfcheck.txt";
    std::ofstream out(report);
    out << "tessel " << TESSEL_VERSION_STRING << "\n"
        << "OpenImageIO " << OIIO_VERSION_STRING << "\n"
        << "Qt " << QT_VERSION_STR << "\n"
        << "ticks per frame " << TrelmSDK::GetTicksPerFrame() << "\n"
        << "image " << image.string() << "\n";
    if (!out) {
        std::cerr << "tessel: cannot write " << report << "\n";
        return 1;
    }
    std::cout << "Self-check passed. Result: " << std::filesystem::absolute(report).string() << "\n";
    return 0;
}

const tessel_cli::CommandRegistrar registrar{
    "default", "Run the default job (the self-check) and write its result",
    [](CLI::App& sub) -> std::function<int()> {
        auto outDir = std::make_shared<std::string>("out");
        sub.add_option("--output-dir", *outDir, "Folder for the results")->capture_default_str();
        return [outDir] { return runSelfCheck(*outDir); };
    }};

} // namespace
