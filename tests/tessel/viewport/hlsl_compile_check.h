// Test support: wraps a generated viewport function with the host's HLSL library in a small
// compute shader and compiles it with glslangValidator's HLSL front end.
#pragma once

#include <trelm/viewport/hlsl_library.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <unistd.h>
#include <vector>

namespace viewport_test {

struct Parameter {
    bool out = false;
    std::string type;
    std::string name;
    std::string array; // "", "[N]" or "[]"
};

struct GeneratedFunction {
    std::vector<std::string> includes;
    std::string name;
    std::vector<Parameter> parameters;
    std::string text; // signature and body
};

// Splits the text mode output into its include list, signature and body.
inline bool ParseGenerated(const std::string& output, GeneratedFunction& function) {
    std::string rest = output;
    const std::string header = "/* == ADDITIONAL SETTINGS: \n";
    if (rest.rfind(header, 0) == 0) {
        const size_t end = rest.find("\n*/\n");
        if (end == std::string::npos) return false;
        std::istringstream lines(rest.substr(header.size(), end - header.size()));
        std::string line;
        while (std::getline(lines, line)) {
            if (line.rfind("include:", 0) == 0 || line.rfind("predefine:", 0) == 0 ||
                line == "nonconsolidatable")
                function.includes.push_back(line);
            else if (!function.includes.empty())
                function.includes.back() += "\n" + line;
        }
        rest = rest.substr(end + 4);
    }
    function.text = rest;
    if (rest.rfind("void ", 0) != 0) return false;
    const size_t open = rest.find('(');
    const size_t close = rest.find(")\n{\n");
    if (open == std::string::npos || close == std::string::npos) return false;
    function.name = rest.substr(5, open - 5);
    const std::string list = rest.substr(open + 1, close - open - 1);
    size_t start = 0;
    while (start < list.size()) {
        size_t comma = list.find(", ", start);
        if (comma == std::string::npos) comma = list.size();
        std::string entry = list.substr(start, comma - start);
        start = comma + 2;
        Parameter parameter;
        if (entry.rfind("out ", 0) == 0) {
            parameter.out = true;
            entry = entry.substr(4);
        }
        const size_t bracket = entry.find('[');
        if (bracket != std::string::npos) {
            parameter.array = entry.substr(bracket);
            entry = entry.substr(0, bracket);
        }
        const size_t blank = entry.find(' ');
        if (blank == std::string::npos) return false;
        parameter.type = entry.substr(0, blank);
        parameter.name = entry.substr(blank + 1);
        function.parameters.push_back(parameter);
    }
    return true;
}

// One compute shader that calls each function once with default arguments; the functions'
// include lists are merged, each entry once.
inline std::string WrapInComputeShader(const std::vector<GeneratedFunction>& functions,
                                       std::string& error) {
    std::vector<std::string> includes;
    std::string texts;
    for (const GeneratedFunction& function : functions) {
        for (const std::string& entry : function.includes)
            if (std::find(includes.begin(), includes.end(), entry) == includes.end())
                includes.push_back(entry);
        texts += function.text + "\n";
    }
    std::ostringstream main;
    std::ostringstream globals;
    std::vector<std::string> infos;
    for (const GeneratedFunction& function : functions) {
        std::string arguments;
        main << "    {\n";
        for (const Parameter& p : function.parameters) {
            if (p.type == "ksg_sampler2D") {
                const std::string global = "arg_" + function.name + "_" + p.name;
                globals << "ksg_sampler2D " << global << ";\n";
                if (std::find(infos.begin(), infos.end(), p.name) == infos.end()) {
                    infos.push_back(p.name);
                    globals << "float4 " << p.name << "_info;\n";
                }
                arguments += (arguments.empty() ? "" : ", ") + global;
                continue;
            }
            const std::string local = "arg_" + p.name;
            const std::string array = p.array == "[]" ? "[1]" : p.array;
            main << "        " << p.type << " " << local << array;
            if (array.empty()) main << " = (" << p.type << ")0";
            main << ";\n";
            arguments += (arguments.empty() ? "" : ", ") + local;
        }
        main << "        " << function.name << "(" << arguments << ");\n    }\n";
    }
    // Sampler companions (S_info) are globals that the functions read.
    std::string shader =
        TrelmSDK::Graphics::ksg::AssembleLibraryEntry(includes, globals.str() + texts, error);
    if (shader.empty()) return {};
    shader += std::string("\nRWStructuredBuffer<float4> ksg_test_result;\n") +
              "[numthreads(1, 1, 1)]\nvoid main()\n{\n" + main.str() +
              "    ksg_test_result[0] = float4(0, 0, 0, 1);\n}\n";
    return shader;
}

struct CompileResult {
    bool ok = false;
    std::string log;
};

// Without legalization glslang still parses and type-checks everything, and is much faster on
// large shaders; legalization (inlining, resolving samplers in structs) is checked where the
// shaders are small.
enum class Legalize { Yes, No };

// With `spirv` the compiled module is read back into it.
inline CompileResult CompileHLSL(const std::string& shader, Legalize legalize = Legalize::Yes,
                                 std::vector<uint32_t>* spirv = nullptr) {
    static std::atomic<int> counter{0};
    const std::filesystem::path dir =
        std::filesystem::temp_directory_path() / ("tessel_viewport_" + std::to_string(getpid()));
    std::filesystem::create_directories(dir);
    const std::string stem = (dir / ("shader" + std::to_string(counter++))).string();
    {
        std::ofstream file(stem + ".hlsl");
        file << shader;
    }
    const std::string command = std::string("glslangValidator -V ") +
                                (legalize == Legalize::No ? "-Od " : "") + "-D -e main -S comp " +
                                stem + ".hlsl -o " + stem + ".spv > " + stem + ".log 2>&1";
    CompileResult result;
    result.ok = std::system(command.c_str()) == 0;
    std::ifstream log(stem + ".log");
    std::ostringstream text;
    text << log.rdbuf();
    result.log = text.str();
    if (spirv && result.ok) {
        std::ifstream module(stem + ".spv", std::ios::binary);
        const std::string bytes{std::istreambuf_iterator<char>(module),
                                std::istreambuf_iterator<char>()};
        spirv->resize(bytes.size() / sizeof(uint32_t));
        std::memcpy(spirv->data(), bytes.data(), spirv->size() * sizeof(uint32_t));
    }
    std::filesystem::remove(stem + ".hlsl");
    std::filesystem::remove(stem + ".spv");
    std::filesystem::remove(stem + ".log");
    return result;
}

inline CompileResult CompileHLSLToSPIRV(const std::string& shader, std::vector<uint32_t>& spirv) {
    return CompileHLSL(shader, Legalize::Yes, &spirv);
}

// Compiles the text mode outputs of several translations in one shader; a failure carries the
// compiler log and the shader.
inline CompileResult CompileGenerated(const std::vector<std::string>& outputs,
                                      Legalize legalize = Legalize::Yes) {
    std::vector<GeneratedFunction> functions;
    for (const std::string& output : outputs) {
        GeneratedFunction function;
        if (!ParseGenerated(output, function)) return {false, "unparsable output:\n" + output};
        functions.push_back(function);
    }
    std::string error;
    const std::string shader = WrapInComputeShader(functions, error);
    if (shader.empty()) return {false, error};
    CompileResult result = CompileHLSL(shader, legalize);
    if (!result.ok) result.log += "\n---- shader ----\n" + shader;
    return result;
}

inline CompileResult CompileGenerated(const std::string& output,
                                      Legalize legalize = Legalize::Yes) {
    return CompileGenerated(std::vector<std::string>{output}, legalize);
}

inline bool GlslangAvailable() {
    return std::system("glslangValidator --version > /dev/null 2>&1") == 0;
}

} // namespace viewport_test
