// Storage of the registered subcommands (function-local so registration order never matters).
#include "command_registry.h"

namespace tessel_cli {

std::vector<Command>& commands() {
    static std::vector<Command> list;
    return list;
}

CommandRegistrar::CommandRegistrar(std::string name, std::string description, CommandSetup setup) {
    commands().push_back({std::move(name), std::move(description), std::move(setup)});
}

} // namespace tessel_cli
