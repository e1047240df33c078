// Subcommands of the tessel CLI register themselves here from their own files, so adding a
// command never touches main.cpp.
#pragma once

#include <CLI/CLI.hpp>

#include <functional>
#include <string>
#include <vector>

namespace tessel_cli {

// Adds the command's options to its subcommand and returns the function that runs it once the
// command line is parsed; the runner returns the process exit status.
using CommandSetup = std::function<std::function<int()>(CLI::App& sub)>;

struct Command {
    std::string name;
    std::string description;
    CommandSetup setup;
};

std::vector<Command>& commands();

// A file-scope CommandRegistrar adds one command at static initialisation.
struct CommandRegistrar {
    CommandRegistrar(std::string name, std::string description, CommandSetup setup);
};

} // namespace tessel_cli
