// `tessel hlsl FILE.osl|FILE.oso`: the viewport translation of a shader. The HLSL goes to
// standard output; the accuracy and the translator's messages go to standard error.
#include "command_registry.h"

#include <viewport/hlsl_generator.h>
#include <viewport/precompute_function.h>

#ifdef TESSEL_HAVE_OSL_COMPILER
#include <OSL/oslcomp.h>
#endif

#include <OpenImageIO/errorhandler.h>

#include <cctype>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>
#include <sstream>

namespace {

bool ReadText(const std::filesystem::path& path, std::string& text) {
    std::ifstream in(path, std::ios::binary);
    if (!in) return false;
    std::ostringstream buffer;
    buffer << in.rdbuf();
    text = buffer.str();
    return static_cast<bool>(in) || in.eof();
}

// The OSO text of the input: the file itself, or what the compiler makes of an .osl file.
bool LoadOSO(const std::filesystem::path& path, std::string& oso) {
    std::string text;
    if (!ReadText(path, text)) {
        std::cerr << "tessel hlsl: cannot read " << path.string() << "\n";
        return false;
    }
    if (path.extension() != ".osl") {
        oso = std::move(text);
        return true;
    }
#ifdef TESSEL_HAVE_OSL_COMPILER
    OSL::OSLCompiler compiler(&OIIO::ErrorHandler::default_handler());
    if (!compiler.compile_buffer(text, oso, {}, {}, path.string())) {
        std::cerr << "tessel hlsl: " << path.string() << " does not compile\n";
        return false;
    }
    return true;
#else
    std::cerr << "tessel hlsl: this build has no OSL compiler; give the compiled .oso file "
                 "instead of "
              << path.string() << "\n";
    return false;
#endif
}

// A function name made from the file name: letters, digits and underscores only.
std::string FunctionName(const std::filesystem::path& path) {
    std::string name = "OSL_" + path.stem().string();
    for (char& c : name)
        if (!std::isalnum(static_cast<unsigned char>(c))) c = '_';
    return name;
}

// The inputs that the CPU computes for the function, as they come out for the shader's default
// parameter values: the file of each sampler, the code of each string-op result.
void PrintPrecomputedInputs(const std::string& name) {
    const oslo::PrecomputeResults results = oslo::RunPrecomputeFunction(name, {});
    if (results.empty()) return;
    std::cerr << "Computed on the CPU for the default parameter values:\n";
    for (const auto& [input, value] : results) {
        std::cerr << "  " << input << " = " << value.value;
        if (!value.str.empty()) std::cerr << " \"" << oslo::NarrowText(value.str) << "\"";
        std::cerr << "\n";
    }
}

int RunHLSL(const std::string& file, const std::string& nameOption) {
    const std::filesystem::path path(file);
    std::string oso;
    if (!LoadOSO(path, oso)) return 1;
    oslo::_hlsl_info info;
    std::string hlsl;
    const std::string name = nameOption.empty() ? FunctionName(path) : nameOption;
    const bool translated = oslo::GenerateHLSL(name, oso, info, &hlsl);
    if (translated) std::cout << hlsl;
    for (const auto& [message, count] : info.messages)
        std::cerr << message << (count > 1 ? " (" + std::to_string(count) + " times)" : "") << "\n";
    if (!translated) {
        std::cerr << "tessel hlsl: no HLSL generated for " << path.string() << "\n";
        return 1;
    }
    std::cerr << "Accuracy: " << info.accuracy << "% (" << info.unsupportedCount
              << " unsupported of " << info.opCount << " instructions)\n";
    PrintPrecomputedInputs(name);
    return 0;
}

const tessel_cli::CommandRegistrar registrar{
    "hlsl", "Translate a shader (.osl or .oso) to the viewport's HLSL",
    [](CLI::App& sub) -> std::function<int()> {
        auto file = std::make_shared<std::string>();
        auto name = std::make_shared<std::string>();
        sub.add_option("file", *file, "The shader, as OSL source or compiled OSO")->required();
        sub.add_option("--name", *name, "Name of the generated function (default: from the file)");
        return [file, name] { return RunHLSL(*file, *name); };
    }};

} // namespace
