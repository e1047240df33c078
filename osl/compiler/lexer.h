// Splits preprocessed OSL text into tokens, following `#line` markers so that every token knows
// the file and line it came from, and acting on `#pragma` lines.
#pragma once

#include "diagnostics.h"

#include <string>
#include <vector>

namespace OSL::pvt {

enum class Tok { End, Ident, IntLit, FloatLit, StringLit, Punct };

struct Token {
    Tok kind = Tok::End;
    std::string text; // identifier or operator spelling; decoded contents for strings
    long long intValue = 0;
    double floatValue = 0;
    int file = 0; // index into Lexer::files()
    int line = 0;
};

class Lexer {
public:
    Lexer(Diagnostics& diag) : m_diag(diag) {}
    // Tokenizes all of `text`; false when an error was reported.
    bool run(const std::string& text);
    const std::vector<Token>& tokens() const { return m_tokens; }
    const std::vector<std::string>& files() const { return m_files; }

private:
    int fileIndex(const std::string& name);
    void pragma(const std::string& text, int file, int line);
    Diagnostics& m_diag;
    std::vector<Token> m_tokens;
    std::vector<std::string> m_files;
    bool m_ok = true;
};

} // namespace OSL::pvt
