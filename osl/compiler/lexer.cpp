// The OSL lexer. Numbers follow C rules (decimal, hex and octal ints; floats with optional
// exponent and f suffix); adjacent string literals are joined later by the parser.
#include "lexer.h"

#include <cctype>
#include <cstdlib>
#include <cstring>

namespace OSL::pvt {

namespace {
const char* const kOps3[] = {"<<=", ">>=", "...", nullptr};
const char* const kOps2[] = {"<<", ">>", "<=", ">=", "==", "!=", "&&", "||", "+=", "-=",   "*=",
                             "/=", "%=", "&=", "|=", "^=", "++", "--", "[[", "]]", nullptr};
} // namespace

int Lexer::fileIndex(const std::string& name) {
    for (size_t i = 0; i < m_files.size(); ++i)
        if (m_files[i] == name) return int(i);
    m_files.push_back(name);
    return int(m_files.size() - 1);
}

void Lexer::pragma(const std::string& text, int file, int line) {
    // `#pragma error "msg"` / `#pragma warning "msg"` report; `#pragma osl nowarn` silences the
    // warnings of the next line; other pragmas are accepted silently.
    size_t p = text.find_first_not_of(" \t");
    std::string rest = p == std::string::npos ? "" : text.substr(p);
    auto word = rest.substr(0, rest.find_first_of(" \t"));
    std::string msg = rest.size() > word.size() ? rest.substr(word.size()) : "";
    auto q1 = msg.find('"'), q2 = msg.rfind('"');
    if (q1 != std::string::npos && q2 > q1) msg = msg.substr(q1 + 1, q2 - q1 - 1);
    if (word == "error") {
        m_diag.error(m_files[file], line, msg);
        m_ok = false;
    } else if (word == "warning") {
        m_diag.warning(m_files[file], line, msg);
    } else if (word == "osl") {
        size_t a = rest.find_first_not_of(" \t", word.size());
        std::string what = a == std::string::npos ? "" : rest.substr(a);
        if (what.substr(0, what.find_first_of(" \t")) == "nowarn")
            m_diag.suppressWarningsAt(m_files[file], line + 1);
    }
}

bool Lexer::run(const std::string& src) {
    m_tokens.clear();
    int file = fileIndex("<buffer>");
    int line = 1;
    size_t i = 0, n = src.size();
    bool lineStart = true;
    while (i < n) {
        char c = src[i];
        if (c == '\n') {
            ++line;
            ++i;
            lineStart = true;
            continue;
        }
        if (std::isspace((unsigned char)c)) {
            ++i;
            continue;
        }
        if (c == '#' && lineStart) {
            size_t e = src.find('\n', i);
            if (e == std::string::npos) e = n;
            std::string dir = src.substr(i + 1, e - i - 1);
            if (dir.rfind("line ", 0) == 0) {
                const char* s = dir.c_str() + 5;
                char* end = nullptr;
                long ln = std::strtol(s, &end, 10);
                auto q1 = dir.find('"'), q2 = dir.rfind('"');
                if (q1 != std::string::npos && q2 > q1)
                    file = fileIndex(dir.substr(q1 + 1, q2 - q1 - 1));
                line = int(ln);
                i = e + 1;
                continue;
            }
            if (dir.rfind("pragma", 0) == 0) pragma(dir.substr(6), file, line);
            i = e;
            continue;
        }
        lineStart = false;
        Token t;
        t.file = file;
        t.line = line;
        if (std::isalpha((unsigned char)c) || c == '_') {
            size_t s = i;
            while (i < n && (std::isalnum((unsigned char)src[i]) || src[i] == '_')) ++i;
            t.kind = Tok::Ident;
            t.text = src.substr(s, i - s);
        } else if (std::isdigit((unsigned char)c) ||
                   (c == '.' && i + 1 < n && std::isdigit((unsigned char)src[i + 1]))) {
            size_t s = i;
            bool isFloat = false;
            if (c == '0' && i + 1 < n && (src[i + 1] == 'x' || src[i + 1] == 'X')) {
                i += 2;
                while (i < n && std::isxdigit((unsigned char)src[i])) ++i;
            } else {
                while (i < n && std::isdigit((unsigned char)src[i])) ++i;
                if (i < n && src[i] == '.') {
                    isFloat = true;
                    ++i;
                    while (i < n && std::isdigit((unsigned char)src[i])) ++i;
                }
                if (i < n && (src[i] == 'e' || src[i] == 'E')) {
                    size_t j = i + 1;
                    if (j < n && (src[j] == '+' || src[j] == '-')) ++j;
                    if (j < n && std::isdigit((unsigned char)src[j])) {
                        isFloat = true;
                        i = j;
                        while (i < n && std::isdigit((unsigned char)src[i])) ++i;
                    }
                }
            }
            std::string num = src.substr(s, i - s);
            if (i < n && (src[i] == 'f' || src[i] == 'F')) {
                isFloat = true;
                ++i;
            }
            if (isFloat) {
                t.kind = Tok::FloatLit;
                t.floatValue = std::strtod(num.c_str(), nullptr);
            } else {
                t.kind = Tok::IntLit;
                t.intValue = (long long)std::strtoull(num.c_str(), nullptr, 0);
            }
            t.text = num;
        } else if (c == '"') {
            ++i;
            std::string v;
            bool closed = false;
            while (i < n && src[i] != '\n') {
                char d = src[i++];
                if (d == '"') {
                    closed = true;
                    break;
                }
                if (d == '\\' && i < n) {
                    char e = src[i++];
                    switch (e) {
                    case 'n':
                        v += '\n';
                        break;
                    case 't':
                        v += '\t';
                        break;
                    case 'r':
                        v += '\r';
                        break;
                    case 'a':
                        v += '\a';
                        break;
                    case 'b':
                        v += '\b';
                        break;
                    case 'f':
                        v += '\f';
                        break;
                    case 'v':
                        v += '\v';
                        break;
                    case '0':
                    case '1':
                    case '2':
                    case '3':
                    case '4':
                    case '5':
                    case '6':
                    case '7': {
                        int val = e - '0';
                        for (int k = 0; k < 2 && i < n && src[i] >= '0' && src[i] <= '7'; ++k)
                            val = val * 8 + (src[i++] - '0');
                        v += char(val);
                        break;
                    }
                    case 'x': {
                        int val = 0;
                        while (i < n && std::isxdigit((unsigned char)src[i])) {
                            char h = src[i++];
                            val = val * 16 + (std::isdigit((unsigned char)h)
                                                  ? h - '0'
                                                  : (std::tolower(h) - 'a' + 10));
                        }
                        v += char(val);
                        break;
                    }
                    default:
                        v += e;
                    }
                } else {
                    v += d;
                }
            }
            if (!closed) {
                m_diag.error(m_files[file], line, "unterminated string literal");
                m_ok = false;
            }
            t.kind = Tok::StringLit;
            t.text = v;
        } else {
            t.kind = Tok::Punct;
            bool matched = false;
            for (const char* const* p = kOps3; *p && !matched; ++p)
                if (src.compare(i, 3, *p) == 0) t.text = *p, matched = true;
            for (const char* const* p = kOps2; *p && !matched; ++p)
                if (src.compare(i, 2, *p) == 0) t.text = *p, matched = true;
            if (!matched) {
                if (!std::strchr("+-*/%<>=!~&|^?:;,.()[]{}", c)) {
                    m_diag.error(m_files[file], line, std::string("invalid character '") + c + "'");
                    m_ok = false;
                    ++i;
                    continue;
                }
                t.text = std::string(1, c);
            }
            i += t.text.size();
        }
        m_tokens.push_back(std::move(t));
    }
    Token end;
    end.kind = Tok::End;
    end.file = file;
    end.line = line;
    m_tokens.push_back(end);
    return m_ok;
}

} // namespace OSL::pvt
