// The OSL preprocessor: a C-style preprocessor (includes, macros, conditionals) whose output
// keeps every line where it was and marks file changes with `#line N "FILE"` for the lexer.
#pragma once

#include "diagnostics.h"

#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

namespace OSL::pvt {

enum class PPKind { Ident, Number, String, Char, Punct, Space, Newline, Other, Placemarker };

using HideSet = std::shared_ptr<const std::set<std::string>>;

struct PPToken {
    PPKind kind = PPKind::Other;
    std::string text;
    int line = 0;
    int newlines = 1; // for Newline tokens: physical lines it stands for (line splices)
    HideSet hide;
    bool noExpand = false; // an identifier met while its macro was being expanded
};

class Preprocessor {
public:
    explicit Preprocessor(Diagnostics& diag);
    ~Preprocessor();

    void addIncludeDir(const std::string& dir) { m_includeDirs.push_back(dir); }
    // Headers that are found when no include folder holds the name (the shipped shader headers).
    void addBuiltinHeader(const std::string& name, const std::string& text) {
        m_builtinHeaders[name] = text;
    }
    // -DNAME, -DNAME=VALUE and -UNAME.
    void defineFromOption(const std::string& spec);
    void undefine(const std::string& name) { m_macros.erase(name); }

    // Preprocesses `source` (named `filename` in diagnostics). False when an error was reported.
    bool run(const std::string& source, const std::string& filename, std::string& out);

    // Every file read through #include, in order of first inclusion (for -M dependency lists).
    const std::vector<std::string>& includedFiles() const { return m_included; }

    struct Macro {
        bool functionLike = false;
        bool variadic = false;
        std::vector<std::string> params;
        std::vector<PPToken> body;
    };

private:
    struct FileState;
    void processFile(const std::string& text, const std::string& filename, int depth);
    void directive(FileState& fs, const std::vector<PPToken>& line, int lineNo, int depth);
    void defineMacro(FileState& fs, const std::vector<PPToken>& toks, size_t i, int lineNo);
    bool evalCondition(FileState& fs, const std::vector<PPToken>& toks, size_t i, int lineNo);
    void include(FileState& fs, const std::vector<PPToken>& toks, size_t i, int lineNo, int depth);
    std::vector<PPToken> expand(std::vector<PPToken> input, const std::string& file);
    std::vector<PPToken> substitute(const Macro& m, const std::vector<std::vector<PPToken>>& args,
                                    const std::string& file, int line);
    void emitLineMarker(int line, const std::string& file);

    Diagnostics& m_diag;
    std::vector<std::string> m_includeDirs;
    std::map<std::string, std::string> m_builtinHeaders;
    std::map<std::string, Macro> m_macros;
    std::vector<std::string> m_included;
    std::set<std::string> m_onceFiles;
    std::string m_out;
    bool m_failed = false;
};

} // namespace OSL::pvt
