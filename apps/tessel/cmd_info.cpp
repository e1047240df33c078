// `tessel info`: lists the parameters of compiled shaders, as the reference `oslinfo` does.
#include "command_registry.h"

#include <OSL/oslinfo.h>

#include <iostream>
#include <memory>

namespace {

struct InfoArgs {
    OSL::OSLInfoOptions options;
    std::vector<std::string> shaders;
};

int runInfo(const InfoArgs& args) {
    if (args.shaders.empty()) {
        std::cout << "Usage:  tessel info [options] file0 [file1 ...]\n";
        return 1;
    }
    bool ok = true;
    for (const std::string& shader : args.shaders)
        ok = OSL::print_oslinfo(std::cout, shader, args.options) && ok;
    std::cout.flush();
    return ok ? 0 : 1;
}

const tessel_cli::CommandRegistrar registrar{
    "info", "List parameters of compiled OSL shaders (like oslinfo)",
    [](CLI::App& sub) -> std::function<int()> {
        auto args = std::make_shared<InfoArgs>();
        sub.add_flag("-v", args->options.verbose, "Verbose: each default value and all metadata");
        sub.add_option("-p", args->options.searchpath,
                       "Search path for shaders (colon-separated folders)");
        sub.add_option("--param", args->options.oneparam,
                       "Output information on just this parameter");
        sub.add_option("shaders", args->shaders, "Compiled shaders: .oso files or shader names");
        return [args] { return runInfo(*args); };
    }};

} // namespace
