// Entry point of the tessel CLI: parses the command line and runs the chosen subcommand.
#include "command_registry.h"

#include <algorithm>
#include <iostream>
#include <map>

int main(int argc, char** argv) {
    CLI::App app{"tessel: OSL shader toolchain, viewport translator and renderer for Trelm maps"};
    app.set_version_flag("--version", std::string("tessel ") + TESSEL_VERSION_STRING);
    app.require_subcommand(0, 1);

    auto& cmds = tessel_cli::commands();
    std::sort(cmds.begin(), cmds.end(),
              [](const auto& a, const auto& b) { return a.name < b.name; });
    std::map<CLI::App*, std::function<int()>> runners;
    for (auto& cmd : cmds) {
        CLI::App* sub = app.add_subcommand(cmd.name, cmd.description);
        runners[sub] = cmd.setup(*sub);
    }

    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& e) {
        return app.exit(e);
    }

    for (auto& [sub, run] : runners)
        if (sub->parsed()) return run();

    // Without a subcommand the tool runs its default job.
    for (auto& [sub, run] : runners)
        if (sub->get_name() == "default") return run();
    std::cout << app.help();
    return 0;
}
