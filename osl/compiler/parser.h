// Recursive-descent parser for OSL: tokens in, a list of top-level declarations out.
#pragma once

#include "ast.h"
#include "diagnostics.h"
#include "lexer.h"

#include <set>

namespace OSL::pvt {

class Parser {
public:
    Parser(const std::vector<Token>& toks, const std::vector<std::string>& files, Diagnostics& diag)
        : m_toks(toks), m_files(files), m_diag(diag) {}
    // Parses the whole token stream; false after a syntax error (reported through diag).
    bool parse(std::vector<NodePtr>& decls);

private:
    struct SyntaxError {};
    const Token& peek(size_t ahead = 0) const;
    const Token& next();
    bool isPunct(const char* p, size_t ahead = 0) const;
    bool isIdent(const char* word, size_t ahead = 0) const;
    bool accept(const char* p);
    void expect(const char* p);
    [[noreturn]] void fail(const std::string& what);
    NodePtr make(NodeKind k, const Token& at);
    bool isTypeStart(size_t ahead = 0) const;
    TypeName parseType();
    std::string parseIdent();

    NodePtr topLevel();
    NodePtr structDecl();
    NodePtr functionOrShader(bool isShader);
    void metadataBlock(std::vector<NodePtr>& out);
    NodePtr param(bool shaderParam);
    NodePtr statement();
    NodePtr block();
    NodePtr varDecl(TypeName type, const Token& at);
    NodePtr initializer();

    NodePtr expression(); // with comma operator
    NodePtr assignment();
    NodePtr ternary();
    NodePtr binary(int minPrec);
    NodePtr unary();
    NodePtr postfix(NodePtr e);
    NodePtr primary();

    const std::vector<Token>& m_toks;
    const std::vector<std::string>& m_files;
    Diagnostics& m_diag;
    size_t m_pos = 0;
    int m_depth = 0;
    std::set<std::string> m_structNames;
};

} // namespace OSL::pvt
