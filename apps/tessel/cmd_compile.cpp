// `tessel compile`: the OSL compiler with oslc's command line. Prints "Compiled a.osl -> a.oso"
// or "FAILED a.osl", and the compiler's diagnostics as they come.
#include "command_registry.h"

#include <OSL/oslcomp.h>

#include <iostream>
#include <memory>

namespace {

// Prints messages plainly, the way oslc does (no "ERROR:" prefixes).
class PlainErrorHandler final : public OSL::ErrorHandler {
public:
    void operator()(int errcode, const std::string& msg) override {
        if (errcode == EH_INFO || errcode == EH_MESSAGE)
            std::cout << msg << "\n";
        else
            std::cerr << msg << "\n";
    }
};

int runCompile(const std::vector<std::string>& args) {
    std::vector<std::string> options, files;
    bool quiet = false;
    for (size_t i = 0; i < args.size(); ++i) {
        const std::string& a = args[i];
        if (a == "-h" || a == "--help") {
            std::cout << "tessel compile -- Open Shading Language compiler\n"
                         "Usage:  tessel compile [options] file.osl\n"
                         "  -o FILE      output file (default: NAME.oso in the current folder)\n"
                         "  -I DIR       add an include folder\n"
                         "  -D SYM[=VAL] define a macro;  -U SYM  undefine it\n"
                         "  -E           only preprocess, to the output\n"
                         "  -O0 -O1 -O2  optimisation level\n"
                         "  -M -MM       only write a make rule of the files read, to stdout\n"
                         "  -MD -MMD     write it to NAME.d (-MM, -MMD: without standard headers)\n"
                         "  -MF FILE     the file for the rule;  -MT TARGET  the rule's target\n"
                         "  -Wall -Werror  warnings; warnings as errors\n"
                         "  -q           quiet\n";
            return 0;
        }
        if (a == "-q") quiet = true;
        if (!a.empty() && a[0] == '-') {
            options.push_back(a);
            bool takesValue = a == "-o" || a == "-I" || a == "-D" || a == "-U" || a == "-MF" ||
                              a == "-MT" || a == "-MQ";
            if (takesValue && i + 1 < args.size()) options.push_back(args[++i]);
        } else {
            files.push_back(a);
        }
    }
    if (files.empty()) {
        std::cerr << "tessel compile: no input file\n";
        return 1;
    }
    // -M and -MM only print the make rule, as oslc does: no compile line follows it.
    bool depsOnly = false;
    for (const auto& o : options) depsOnly = depsOnly || o == "-M" || o == "-MM";
    PlainErrorHandler handler;
    int status = 0;
    for (const auto& f : files) {
        OSL::OSLCompiler compiler(&handler);
        if (compiler.compile(f, options)) {
            if (!quiet && !depsOnly)
                std::cout << "Compiled " << f << " -> " << compiler.output_filename() << "\n";
        } else {
            std::cout << "FAILED " << f << "\n";
            status = 1;
        }
    }
    return status;
}

const tessel_cli::CommandRegistrar registrar{
    "compile", "Compile OSL source to OSO (oslc's options)",
    [](CLI::App& sub) -> std::function<int()> {
        auto args = std::make_shared<std::vector<std::string>>();
        sub.allow_extras();
        sub.prefix_command();
        sub.set_help_flag();
        return [args, &sub] {
            *args = sub.remaining();
            return runCompile(*args);
        };
    }};

} // namespace
