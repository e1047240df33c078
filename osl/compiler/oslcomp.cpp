// OSLCompiler: runs the stages (preprocess, lex, parse, check and generate, write OSO) over a
// file or a buffer with oslc's command-line options.
#include <OSL/oslcomp.h>

#include "codegen.h"
#include "diagnostics.h"
#include "lexer.h"
#include "oso_writer.h"
#include "parser.h"
#include "preprocessor.h"
#include "shader_headers.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace OSL {
namespace pvt {

class OSLCompilerImpl {
public:
    explicit OSLCompilerImpl(ErrorHandler* eh) : m_handler(eh) {}
    ErrorHandler& handler() { return *m_handler; }

    bool compile(const std::string& source, const std::string& filename,
                 const std::vector<std::string>& options, const std::string& stdoslpath,
                 std::string& oso, bool toFile);
    std::string outputFilename;

private:
    ErrorHandler* m_handler;
};

// What -M, -MM, -MD, -MMD, -MF and -MT ask for: a make rule naming the files the shader reads.
struct DependencyRequest {
    bool wanted = false;
    bool system = false;   // list the standard headers too (-M, -MD)
    bool toStdout = false; // -M, -MM without -MF
    std::string file, target;
};

static bool isBuiltinHeader(const std::string& name) {
    for (const auto& h : builtinShaderHeaders())
        if (h.first == name) return true;
    return false;
}

static bool readFile(const std::string& path, std::string& text) {
    std::ifstream in(path, std::ios::binary);
    if (!in) return false;
    std::stringstream ss;
    ss << in.rdbuf();
    text = ss.str();
    return true;
}

bool OSLCompilerImpl::compile(const std::string& source, const std::string& filename,
                              const std::vector<std::string>& options,
                              const std::string& stdoslpath, std::string& oso, bool toFile) {
    Diagnostics diag(m_handler);
    Preprocessor pp(diag);
    for (const auto& h : builtinShaderHeaders()) pp.addBuiltinHeader(h.first, h.second);
    std::string output, echoed;
    bool preprocessOnly = false;
    DependencyRequest deps;
    for (size_t i = 0; i < options.size(); ++i) {
        const std::string& o = options[i];
        auto value = [&](size_t prefix) -> std::string {
            if (o.size() > prefix) return o.substr(prefix);
            if (i + 1 < options.size()) return options[++i];
            return "";
        };
        if (o.rfind("-I", 0) == 0) {
            pp.addIncludeDir(value(2));
        } else if (o.rfind("-D", 0) == 0) {
            pp.defineFromOption(value(2));
        } else if (o.rfind("-U", 0) == 0) {
            pp.undefine(value(2));
        } else if (o == "-o") {
            output = value(2);
            continue;
        } else if (o == "-E") {
            preprocessOnly = true;
        } else if (o == "-Werror") {
            diag.warningsAreErrors = true;
        } else if (o == "-q") {
            diag.quiet = true;
        } else if (o == "-M" || o == "-MM" || o == "-MD" || o == "-MMD") {
            deps.wanted = true;
            deps.system = o == "-M" || o == "-MD";
            deps.toStdout = o == "-M" || o == "-MM";
        } else if (o.rfind("-MF", 0) == 0) {
            deps.file = value(3);
            continue;
        } else if (o.rfind("-MT", 0) == 0 || o.rfind("-MQ", 0) == 0) {
            deps.target = value(3);
            continue;
        }
        echoed += (echoed.empty() ? "" : " ") + o;
    }
    if (!output.empty()) echoed = "-o " + output + (echoed.empty() ? "" : " " + echoed);
    std::string display = filename;

    std::string stdosl;
    std::string stdoslName = "stdosl.h";
    if (!stdoslpath.empty()) {
        if (!readFile(stdoslpath, stdosl)) {
            diag.error(stdoslpath, 0, "could not read the standard library header");
            return false;
        }
    } else {
        for (const auto& h : builtinShaderHeaders())
            if (h.first == "stdosl.h") stdosl = h.second;
    }
    std::string pre, userPre;
    if (!pp.run(stdosl, stdoslName, pre)) return false;
    size_t firstUserInclude = pp.includedFiles().size();
    if (!pp.run(source, display, userPre)) return false;
    std::string defaultOutput =
        output.empty() ? std::filesystem::path(filename).stem().string() + ".oso" : output;
    // The make rule, once the bytecode's name is known: without -o the bytecode (and so the
    // rule's target and its .d file) is named after the shader, which only compiling tells.
    auto writeDeps = [&](const std::string& osoName) {
        std::vector<std::string> files;
        if (deps.system) files.push_back(stdoslpath.empty() ? stdoslName : stdoslpath);
        const auto& inc = pp.includedFiles();
        for (size_t k = firstUserInclude; k < inc.size(); ++k)
            if (deps.system || !isBuiltinHeader(inc[k])) files.push_back(inc[k]);
        std::string text = (deps.target.empty() ? osoName : deps.target) + ": " + display;
        for (const auto& f : files) text += " \\\n  " + f;
        text += "\n";
        std::string depFile = deps.file;
        if (depFile.empty() && !deps.toStdout)
            depFile = std::filesystem::path(osoName).replace_extension(".d").string();
        if (depFile.empty() || depFile == "-") {
            std::fputs(text.c_str(), stdout);
            std::fflush(stdout);
            return true;
        }
        std::ofstream df(depFile, std::ios::binary);
        df << text;
        if (!df) {
            diag.error(display, 0, "could not write " + depFile);
            return false;
        }
        return true;
    };
    // -M and -MM ask for the rule alone, without compiling.
    if (deps.wanted && deps.toStdout) return writeDeps(defaultOutput);
    if (preprocessOnly) {
        if (deps.wanted && !writeDeps(defaultOutput)) return false;
        oso = userPre;
        if (toFile) {
            std::ofstream out(output.empty() ? std::string("/dev/stdout") : output);
            out << userPre;
        }
        return true;
    }
    Lexer lexer(diag);
    bool lexed = lexer.run(pre + "\n" + userPre);
    std::vector<std::string> files = lexer.files();
    Parser parser(lexer.tokens(), files, diag);
    std::vector<NodePtr> decls;
    if (!parser.parse(decls) || !lexed) return false;
    CodeGen gen(diag, files);
    ShaderUnit unit;
    if (!gen.run(decls, unit)) return false;
    oso = writeOSO(unit, echoed);
    // Without -o the bytecode is named after the shader it holds, as oslc names it.
    std::string osoName =
        output.empty() && !unit.shaderName.empty() ? unit.shaderName + ".oso" : defaultOutput;
    if (deps.wanted && !writeDeps(osoName)) return false;
    if (toFile) {
        output = osoName;
        std::ofstream out(output, std::ios::binary);
        out << oso;
        if (!out) {
            diag.error(display, 0, "could not write " + output);
            return false;
        }
        outputFilename = output;
    }
    return true;
}

} // namespace pvt

OSLCompiler::OSLCompiler(ErrorHandler* errhandler)
    : m_impl(std::make_unique<pvt::OSLCompilerImpl>(
          errhandler ? errhandler : &ErrorHandler::default_handler())) {}

OSLCompiler::~OSLCompiler() = default;

bool OSLCompiler::compile(string_view filename, const std::vector<std::string>& options,
                          string_view stdoslpath) {
    std::string name(filename), source;
    m_impl->outputFilename.clear();
    if (!pvt::readFile(name, source)) {
        m_impl->handler()(ErrorHandler::EH_ERROR, "Could not open \"" + name + "\"");
        return false;
    }
    std::string oso;
    return m_impl->compile(source, name, options, std::string(stdoslpath), oso, true);
}

bool OSLCompiler::compile_buffer(string_view sourcecode, std::string& osobuffer,
                                 const std::vector<std::string>& options, string_view stdoslpath,
                                 string_view filename) {
    std::string name = filename.empty() ? std::string("<buffer>") : std::string(filename);
    return m_impl->compile(std::string(sourcecode), name, options, std::string(stdoslpath),
                           osobuffer, false);
}

string_view OSLCompiler::output_filename() const {
    return m_impl->outputFilename;
}

} // namespace OSL
