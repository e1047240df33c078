// The OSL preprocessor. Works on tokens: each file is split into pp-tokens, directives are
// obeyed line by line, and runs of text lines are macro-expanded with per-token "hide sets"
// (the names of the macros a token came out of) so that recursive macros stop expanding.
#include "preprocessor.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace OSL::pvt {

namespace {

bool isIdentStart(char c) {
    return std::isalpha((unsigned char)c) || c == '_';
}
bool isIdentChar(char c) {
    return std::isalnum((unsigned char)c) || c == '_';
}

const char* const kPuncts3[] = {"<<=", ">>=", "...", nullptr};
const char* const kPuncts2[] = {"##", "<<", ">>", "<=", ">=", "==", "!=", "&&", "||", "+=",   "-=",
                                "*=", "/=", "%=", "&=", "|=", "^=", "++", "--", "->", nullptr};

// Splits text into pp-tokens. Comments become a single space (block comments keep their line
// breaks as Newline tokens so that line numbers survive); backslash-newline joins lines.
std::vector<PPToken> tokenize(const std::string& src, int firstLine = 1) {
    std::vector<PPToken> out;
    size_t i = 0, n = src.size();
    int line = firstLine;
    int pendingSplices = 0;
    auto push = [&](PPKind k, std::string t) {
        PPToken tok;
        tok.kind = k;
        tok.text = std::move(t);
        tok.line = line;
        out.push_back(std::move(tok));
    };
    while (i < n) {
        char c = src[i];
        if (c == '\\' && i + 1 < n && (src[i + 1] == '\n' || src[i + 1] == '\r')) {
            i += (src[i + 1] == '\r' && i + 2 < n && src[i + 2] == '\n') ? 3 : 2;
            ++line;
            ++pendingSplices;
            continue;
        }
        if (c == '\n') {
            push(PPKind::Newline, "\n");
            out.back().newlines = 1 + pendingSplices;
            pendingSplices = 0;
            ++line;
            ++i;
            continue;
        }
        if (c == ' ' || c == '\t' || c == '\r' || c == '\f' || c == '\v') {
            while (i < n && (src[i] == ' ' || src[i] == '\t' || src[i] == '\r' || src[i] == '\f' ||
                             src[i] == '\v'))
                ++i;
            push(PPKind::Space, " ");
            continue;
        }
        if (c == '/' && i + 1 < n && src[i + 1] == '/') {
            while (i < n && src[i] != '\n') {
                if (src[i] == '\\' && i + 1 < n && src[i + 1] == '\n') {
                    ++line;
                    ++pendingSplices;
                    ++i;
                }
                ++i;
            }
            push(PPKind::Space, " ");
            continue;
        }
        if (c == '/' && i + 1 < n && src[i + 1] == '*') {
            push(PPKind::Space, " ");
            i += 2;
            while (i < n && !(src[i] == '*' && i + 1 < n && src[i + 1] == '/')) {
                if (src[i] == '\n') {
                    push(PPKind::Newline, "\n");
                    out.back().newlines = 1 + pendingSplices;
                    pendingSplices = 0;
                    ++line;
                }
                ++i;
            }
            i = std::min(n, i + 2);
            continue;
        }
        if (isIdentStart(c)) {
            size_t s = i;
            while (i < n && isIdentChar(src[i])) ++i;
            push(PPKind::Ident, src.substr(s, i - s));
            continue;
        }
        if (std::isdigit((unsigned char)c) ||
            (c == '.' && i + 1 < n && std::isdigit((unsigned char)src[i + 1]))) {
            size_t s = i;
            while (i < n) {
                char d = src[i];
                if ((d == 'e' || d == 'E' || d == 'p' || d == 'P') && i + 1 < n &&
                    (src[i + 1] == '+' || src[i + 1] == '-')) {
                    i += 2;
                    continue;
                }
                if (isIdentChar(d) || d == '.') {
                    ++i;
                    continue;
                }
                break;
            }
            push(PPKind::Number, src.substr(s, i - s));
            continue;
        }
        if (c == '"' || c == '\'') {
            size_t s = i++;
            while (i < n && src[i] != c && src[i] != '\n') {
                if (src[i] == '\\' && i + 1 < n) ++i;
                ++i;
            }
            if (i < n && src[i] == c) ++i;
            push(c == '"' ? PPKind::String : PPKind::Char, src.substr(s, i - s));
            continue;
        }
        bool matched = false;
        for (const char* const* p = kPuncts3; *p && !matched; ++p)
            if (src.compare(i, 3, *p) == 0) {
                push(PPKind::Punct, *p);
                i += 3;
                matched = true;
            }
        for (const char* const* p = kPuncts2; *p && !matched; ++p)
            if (src.compare(i, 2, *p) == 0) {
                push(PPKind::Punct, *p);
                i += 2;
                matched = true;
            }
        if (!matched) {
            push(std::ispunct((unsigned char)c) ? PPKind::Punct : PPKind::Other, std::string(1, c));
            ++i;
        }
    }
    return out;
}

bool isSpace(const PPToken& t) {
    return t.kind == PPKind::Space || t.kind == PPKind::Newline;
}

size_t skipSpace(const std::vector<PPToken>& toks, size_t i) {
    while (i < toks.size() && toks[i].kind == PPKind::Space) ++i;
    return i;
}

std::string spell(const std::vector<PPToken>& toks, size_t from = 0,
                  size_t to = std::string::npos) {
    std::string s;
    for (size_t i = from; i < std::min(to, toks.size()); ++i)
        if (toks[i].kind != PPKind::Placemarker)
            s += toks[i].kind == PPKind::Newline ? " " : toks[i].text;
    return s;
}

std::string stringify(const std::vector<PPToken>& toks) {
    std::string s = "\"";
    bool pendingSpace = false;
    for (const auto& t : toks) {
        if (isSpace(t)) {
            pendingSpace = s.size() > 1;
            continue;
        }
        if (pendingSpace) s += ' ';
        pendingSpace = false;
        if (t.kind == PPKind::String || t.kind == PPKind::Char) {
            for (char c : t.text) {
                if (c == '"' || c == '\\') s += '\\';
                s += c;
            }
        } else {
            s += t.text;
        }
    }
    return s + "\"";
}

HideSet withName(const HideSet& hs, const std::string& name) {
    auto s = hs ? std::make_shared<std::set<std::string>>(*hs)
                : std::make_shared<std::set<std::string>>();
    s->insert(name);
    return s;
}

bool hidden(const PPToken& t) {
    return t.hide && t.hide->count(t.text);
}

// Integer expressions of #if, evaluated over the expanded tokens.
class CondEval {
public:
    CondEval(const std::vector<PPToken>& toks) {
        for (const auto& t : toks)
            if (!isSpace(t)) m_toks.push_back(&t);
    }
    bool evaluate(long long& result) {
        result = ternary();
        return !m_bad && m_pos == m_toks.size();
    }

private:
    const PPToken* peek() const { return m_pos < m_toks.size() ? m_toks[m_pos] : nullptr; }
    bool accept(const char* p) {
        if (peek() && peek()->kind == PPKind::Punct && peek()->text == p) {
            ++m_pos;
            return true;
        }
        return false;
    }
    long long ternary() {
        long long c = binary(0);
        if (accept("?")) {
            long long a = ternary();
            if (!accept(":")) m_bad = true;
            long long b = ternary();
            return c ? a : b;
        }
        return c;
    }
    static int precedence(const std::string& op) {
        static const std::map<std::string, int> prec = {
            {"||", 1}, {"&&", 2}, {"|", 3}, {"^", 4},  {"&", 5},  {"==", 6},
            {"!=", 6}, {"<", 7},  {">", 7}, {"<=", 7}, {">=", 7}, {"<<", 8},
            {">>", 8}, {"+", 9},  {"-", 9}, {"*", 10}, {"/", 10}, {"%", 10}};
        auto it = prec.find(op);
        return it == prec.end() ? -1 : it->second;
    }
    long long binary(int minPrec) {
        long long lhs = unary();
        for (;;) {
            const PPToken* t = peek();
            if (!t || t->kind != PPKind::Punct) return lhs;
            int p = precedence(t->text);
            if (p < 0 || p <= minPrec - 1 || p < minPrec) return lhs;
            std::string op = t->text;
            ++m_pos;
            long long rhs = binary(p + 1);
            lhs = apply(op, lhs, rhs);
        }
    }
    long long apply(const std::string& op, long long a, long long b) {
        if (op == "||") return a || b;
        if (op == "&&") return a && b;
        if (op == "|") return a | b;
        if (op == "^") return a ^ b;
        if (op == "&") return a & b;
        if (op == "==") return a == b;
        if (op == "!=") return a != b;
        if (op == "<") return a < b;
        if (op == ">") return a > b;
        if (op == "<=") return a <= b;
        if (op == ">=") return a >= b;
        if (op == "<<") return (b >= 0 && b < 64) ? (long long)((unsigned long long)a << b) : 0;
        if (op == ">>") return (b >= 0 && b < 64) ? a >> b : 0;
        if (op == "+") return (long long)((unsigned long long)a + (unsigned long long)b);
        if (op == "-") return (long long)((unsigned long long)a - (unsigned long long)b);
        if (op == "*") return (long long)((unsigned long long)a * (unsigned long long)b);
        if (b == 0 || (a == LLONG_MIN && b == -1)) {
            m_bad = true;
            return 0;
        }
        return op == "/" ? a / b : a % b;
    }
    long long unary() {
        if (accept("!")) return !unary();
        if (accept("~")) return ~unary();
        if (accept("-")) return -(unsigned long long)unary();
        if (accept("+")) return unary();
        if (accept("(")) {
            long long v = ternary();
            if (!accept(")")) m_bad = true;
            return v;
        }
        const PPToken* t = peek();
        if (!t) {
            m_bad = true;
            return 0;
        }
        ++m_pos;
        if (t->kind == PPKind::Number) {
            std::string s = t->text;
            while (!s.empty() &&
                   (s.back() == 'u' || s.back() == 'U' || s.back() == 'l' || s.back() == 'L'))
                s.pop_back();
            char* end = nullptr;
            long long v = std::strtoll(s.c_str(), &end, 0);
            if (!end || *end) m_bad = true;
            return v;
        }
        if (t->kind == PPKind::Char) return t->text.size() >= 3 ? (unsigned char)t->text[1] : 0;
        if (t->kind == PPKind::Ident) return t->text == "true" ? 1 : 0;
        m_bad = true;
        return 0;
    }
    std::vector<const PPToken*> m_toks;
    size_t m_pos = 0;
    bool m_bad = false;
};

struct Conditional {
    bool active;   // this branch is being emitted
    bool anyTaken; // some branch of this #if was taken already
    bool parentActive;
    bool sawElse = false;
};

} // namespace

struct Preprocessor::FileState {
    std::string file;
    std::string dir;
    std::vector<Conditional> conds;
    bool active() const { return conds.empty() || conds.back().active; }
};

Preprocessor::Preprocessor(Diagnostics& diag) : m_diag(diag) {
    defineFromOption("OSL_VERSION_MAJOR=1");
    defineFromOption("OSL_VERSION_MINOR=12");
    defineFromOption("OSL_VERSION_PATCH=13");
    defineFromOption("OSL_VERSION=11213");
    defineFromOption("__OSL__=1");
}

Preprocessor::~Preprocessor() = default;

void Preprocessor::defineFromOption(const std::string& spec) {
    auto eq = spec.find('=');
    std::string name = spec.substr(0, eq);
    std::string value = eq == std::string::npos ? "1" : spec.substr(eq + 1);
    std::string text = name + " " + value;
    FileState fs;
    fs.file = "<command line>";
    auto toks = tokenize(text);
    defineMacro(fs, toks, 0, 0);
}

void Preprocessor::emitLineMarker(int line, const std::string& file) {
    if (!m_out.empty() && m_out.back() != '\n') m_out += '\n';
    m_out += "#line " + std::to_string(line) + " \"" + file + "\"\n";
}

bool Preprocessor::run(const std::string& source, const std::string& filename, std::string& out) {
    m_out.clear();
    m_failed = false;
    processFile(source, filename, 0);
    out = std::move(m_out);
    m_out.clear();
    return !m_failed;
}

void Preprocessor::processFile(const std::string& text, const std::string& filename, int depth) {
    FileState fs;
    fs.file = filename;
    fs.dir = std::filesystem::path(filename).parent_path().string();
    emitLineMarker(1, filename);
    std::vector<PPToken> toks = tokenize(text);
    std::vector<PPToken> pending; // text lines waiting for expansion
    auto flush = [&] {
        if (pending.empty()) return;
        for (const auto& t : expand(std::move(pending), fs.file)) {
            if (t.kind == PPKind::Newline)
                m_out.append(t.newlines, '\n');
            else if (t.kind != PPKind::Placemarker)
                m_out += t.text;
        }
        pending.clear();
    };
    size_t i = 0;
    while (i < toks.size() && !m_failed) {
        size_t end = i;
        while (end < toks.size() && toks[end].kind != PPKind::Newline) ++end;
        size_t first = skipSpace(toks, i);
        int newlines = end < toks.size() ? toks[end].newlines : 0;
        if (first < end && toks[first].kind == PPKind::Punct && toks[first].text == "#") {
            flush();
            std::vector<PPToken> line(toks.begin() + first + 1, toks.begin() + end);
            directive(fs, line, toks[first].line, depth);
            m_out.append(newlines, '\n');
        } else if (fs.active()) {
            pending.insert(pending.end(), toks.begin() + i,
                           toks.begin() + std::min(end + 1, toks.size()));
        } else {
            m_out.append(newlines, '\n');
        }
        i = end + 1;
    }
    flush();
    if (!fs.conds.empty() && !m_failed) {
        m_diag.error(fs.file, toks.empty() ? 1 : toks.back().line,
                     "unterminated conditional directive");
        m_failed = true;
    }
}

void Preprocessor::directive(FileState& fs, const std::vector<PPToken>& line, int lineNo,
                             int depth) {
    size_t i = skipSpace(line, 0);
    if (i >= line.size()) return; // null directive
    std::string name = line[i].text;
    i = skipSpace(line, i + 1);
    auto err = [&](const std::string& msg) {
        m_diag.error(fs.file, lineNo, msg);
        m_failed = true;
    };
    if (name == "if" || name == "ifdef" || name == "ifndef") {
        bool parent = fs.active();
        bool cond = false;
        if (parent) {
            if (name == "if") {
                cond = evalCondition(fs, line, i, lineNo);
            } else {
                if (i >= line.size() || line[i].kind != PPKind::Ident) {
                    err("macro name missing after #" + name);
                    return;
                }
                cond = m_macros.count(line[i].text) != 0;
                if (name == "ifndef") cond = !cond;
            }
        }
        fs.conds.push_back({parent && cond, parent && cond, parent});
        return;
    }
    if (name == "elif" || name == "else") {
        if (fs.conds.empty() || fs.conds.back().sawElse) {
            err("#" + name + " without #if");
            return;
        }
        Conditional& c = fs.conds.back();
        if (name == "else") {
            c.sawElse = true;
            c.active = c.parentActive && !c.anyTaken;
        } else {
            bool cond = c.parentActive && !c.anyTaken && evalCondition(fs, line, i, lineNo);
            c.active = cond;
        }
        c.anyTaken = c.anyTaken || c.active;
        return;
    }
    if (name == "endif") {
        if (fs.conds.empty()) {
            err("#endif without #if");
            return;
        }
        fs.conds.pop_back();
        return;
    }
    if (!fs.active()) return;
    if (name == "define") {
        defineMacro(fs, line, i, lineNo);
    } else if (name == "undef") {
        if (i < line.size() && line[i].kind == PPKind::Ident)
            m_macros.erase(line[i].text);
        else
            err("macro name missing after #undef");
    } else if (name == "include") {
        include(fs, line, i, lineNo, depth);
    } else if (name == "error") {
        err("#error " + spell(line, i));
    } else if (name == "warning") {
        m_diag.warning(fs.file, lineNo, "#warning " + spell(line, i));
    } else if (name == "pragma") {
        if (i < line.size() && line[i].text == "once") {
            m_onceFiles.insert(fs.file);
            return;
        }
        // Other pragmas are the language's business: the lexer reads them on their own line.
        if (!m_out.empty() && m_out.back() != '\n') m_out += '\n';
        m_out += "#pragma " + spell(line, i);
    } else if (name == "line") {
        // Line control from generated sources: honoured only for numbering, not for files.
    } else if (line[0].kind == PPKind::Number || name.empty()) {
        // "# 12 "file"" markers from an earlier preprocessing pass: pass them through.
    } else {
        err("invalid preprocessing directive #" + name);
    }
}

void Preprocessor::defineMacro(FileState& fs, const std::vector<PPToken>& toks, size_t i,
                               int lineNo) {
    if (i >= toks.size() || toks[i].kind != PPKind::Ident) {
        m_diag.error(fs.file, lineNo, "macro names must be identifiers");
        m_failed = true;
        return;
    }
    Macro m;
    std::string name = toks[i++].text;
    if (i < toks.size() && toks[i].kind == PPKind::Punct && toks[i].text == "(") {
        m.functionLike = true;
        ++i;
        for (;;) {
            i = skipSpace(toks, i);
            if (i >= toks.size()) break;
            if (toks[i].text == ")") {
                ++i;
                break;
            }
            if (toks[i].text == "...") {
                m.variadic = true;
                m.params.push_back("__VA_ARGS__");
            } else if (toks[i].kind == PPKind::Ident) {
                m.params.push_back(toks[i].text);
                size_t j = skipSpace(toks, i + 1);
                if (j < toks.size() && toks[j].text == "...") {
                    m.variadic = true;
                    i = j;
                }
            } else if (toks[i].text != ",") {
                m_diag.error(fs.file, lineNo, "invalid macro parameter list for \"" + name + "\"");
                m_failed = true;
                return;
            }
            ++i;
        }
    }
    i = skipSpace(toks, i);
    size_t end = toks.size();
    while (end > i && isSpace(toks[end - 1])) --end;
    m.body.assign(toks.begin() + i, toks.begin() + end);
    for (auto& t : m.body) t.line = 0;
    m_macros[name] = std::move(m);
}

bool Preprocessor::evalCondition(FileState& fs, const std::vector<PPToken>& toks, size_t i,
                                 int lineNo) {
    std::vector<PPToken> resolved;
    for (; i < toks.size(); ++i) {
        if (toks[i].kind == PPKind::Ident && toks[i].text == "defined") {
            size_t j = skipSpace(toks, i + 1);
            bool paren = j < toks.size() && toks[j].text == "(";
            if (paren) j = skipSpace(toks, j + 1);
            if (j >= toks.size() || toks[j].kind != PPKind::Ident) {
                m_diag.error(fs.file, lineNo, "operator \"defined\" requires an identifier");
                m_failed = true;
                return false;
            }
            PPToken v;
            v.kind = PPKind::Number;
            v.text = m_macros.count(toks[j].text) ? "1" : "0";
            resolved.push_back(v);
            if (paren) {
                j = skipSpace(toks, j + 1);
                if (j >= toks.size() || toks[j].text != ")") {
                    m_diag.error(fs.file, lineNo, "missing ')' after \"defined\"");
                    m_failed = true;
                    return false;
                }
            }
            i = j;
            continue;
        }
        resolved.push_back(toks[i]);
    }
    for (auto& t : resolved) t.line = lineNo;
    auto expanded = expand(std::move(resolved), fs.file);
    long long value = 0;
    CondEval ev(expanded);
    if (!ev.evaluate(value)) {
        m_diag.error(fs.file, lineNo, "invalid expression in #if: " + spell(expanded));
        m_failed = true;
        return false;
    }
    return value != 0;
}

void Preprocessor::include(FileState& fs, const std::vector<PPToken>& toks, size_t i, int lineNo,
                           int depth) {
    std::vector<PPToken> rest(toks.begin() + i, toks.end());
    if (!rest.empty() && rest[0].kind == PPKind::Ident) rest = expand(rest, fs.file);
    std::string spec = spell(rest);
    while (!spec.empty() && spec.back() == ' ') spec.pop_back();
    while (!spec.empty() && spec.front() == ' ') spec.erase(0, 1);
    bool quoted = spec.size() >= 2 && spec.front() == '"' && spec.back() == '"';
    bool angled = spec.size() >= 2 && spec.front() == '<' && spec.back() == '>';
    if (!quoted && !angled) {
        m_diag.error(fs.file, lineNo, "#include expects \"FILENAME\" or <FILENAME>");
        m_failed = true;
        return;
    }
    std::string name = spec.substr(1, spec.size() - 2);
    if (depth > 100) {
        m_diag.error(fs.file, lineNo, "#include nested too deeply");
        m_failed = true;
        return;
    }
    std::vector<std::string> candidates;
    namespace fsys = std::filesystem;
    if (fsys::path(name).is_absolute()) {
        candidates.push_back(name);
    } else {
        if (quoted) candidates.push_back((fsys::path(fs.dir) / name).string());
        for (const auto& d : m_includeDirs) candidates.push_back((fsys::path(d) / name).string());
    }
    std::string found, text;
    for (const auto& c : candidates) {
        std::error_code ec;
        if (!fsys::is_regular_file(c, ec)) continue;
        std::ifstream in(c, std::ios::binary);
        std::stringstream ss;
        ss << in.rdbuf();
        text = ss.str();
        found = c;
        if (found.rfind("./", 0) == 0) found = found.substr(2);
        break;
    }
    if (found.empty()) {
        auto it = m_builtinHeaders.find(name);
        if (it == m_builtinHeaders.end()) {
            m_diag.error(fs.file, lineNo, "Could not find include file \"" + name + "\"");
            m_failed = true;
            return;
        }
        found = name;
        text = it->second;
    }
    if (m_onceFiles.count(found)) return;
    if (std::find(m_included.begin(), m_included.end(), found) == m_included.end())
        m_included.push_back(found);
    processFile(text, found, depth + 1);
    emitLineMarker(lineNo + 1, fs.file);
    m_out.pop_back(); // the directive's own newline follows
}

std::vector<PPToken> Preprocessor::substitute(const Macro& m,
                                              const std::vector<std::vector<PPToken>>& args,
                                              const std::string& file, int line) {
    auto paramIndex = [&](const PPToken& t) -> int {
        if (t.kind != PPKind::Ident) return -1;
        for (size_t k = 0; k < m.params.size(); ++k)
            if (m.params[k] == t.text) return int(k);
        return -1;
    };
    auto argAt = [&](int k) -> const std::vector<PPToken>& {
        static const std::vector<PPToken> none;
        return size_t(k) < args.size() ? args[k] : none;
    };
    auto trimmed = [](std::vector<PPToken> v) {
        while (!v.empty() && isSpace(v.front())) v.erase(v.begin());
        while (!v.empty() && isSpace(v.back())) v.pop_back();
        return v;
    };
    auto nextNonSpace = [&](size_t j) {
        while (j < m.body.size() && isSpace(m.body[j])) ++j;
        return j;
    };
    std::vector<PPToken> out;
    const auto& body = m.body;
    for (size_t j = 0; j < body.size(); ++j) {
        const PPToken& t = body[j];
        if (m.functionLike && t.kind == PPKind::Punct && t.text == "#") {
            size_t k = nextNonSpace(j + 1);
            int p = k < body.size() ? paramIndex(body[k]) : -1;
            if (p >= 0) {
                PPToken s;
                s.kind = PPKind::String;
                s.text = stringify(trimmed(argAt(p)));
                s.line = line;
                out.push_back(s);
                j = k;
                continue;
            }
        }
        if (t.kind == PPKind::Punct && t.text == "##") {
            while (!out.empty() && isSpace(out.back())) out.pop_back();
            size_t k = nextNonSpace(j + 1);
            if (k >= body.size()) break;
            std::vector<PPToken> rhs;
            int p = paramIndex(body[k]);
            if (p >= 0)
                rhs = trimmed(argAt(p));
            else
                rhs.push_back(body[k]);
            // GNU comma swallowing: `, ## __VA_ARGS__` with no variadic arguments drops the comma.
            if (p >= 0 && m.variadic && size_t(p) == m.params.size() - 1 && rhs.empty() &&
                !out.empty() && out.back().text == ",") {
                out.pop_back();
                j = k;
                continue;
            }
            if (!out.empty() && !rhs.empty()) {
                std::string joined = out.back().text + rhs.front().text;
                if (out.back().kind == PPKind::Placemarker) joined = rhs.front().text;
                out.pop_back();
                auto re = tokenize(joined);
                for (auto& r : re) r.line = line;
                out.insert(out.end(), re.begin(), re.end());
                out.insert(out.end(), rhs.begin() + 1, rhs.end());
            } else {
                out.insert(out.end(), rhs.begin(), rhs.end());
            }
            j = k;
            continue;
        }
        int p = m.functionLike ? paramIndex(t) : -1;
        if (p >= 0) {
            size_t k = nextNonSpace(j + 1);
            bool pasted = k < body.size() && body[k].text == "##";
            if (pasted) {
                auto a = trimmed(argAt(p));
                if (a.empty()) {
                    PPToken pm;
                    pm.kind = PPKind::Placemarker;
                    out.push_back(pm);
                } else {
                    out.insert(out.end(), a.begin(), a.end());
                }
            } else {
                auto a = expand(argAt(p), file);
                out.insert(out.end(), a.begin(), a.end());
            }
            continue;
        }
        PPToken c = t;
        c.line = line;
        if (c.kind == PPKind::Newline) c.kind = PPKind::Space;
        out.push_back(c);
    }
    return out;
}

std::vector<PPToken> Preprocessor::expand(std::vector<PPToken> input, const std::string& file) {
    std::vector<PPToken> out;
    std::vector<PPToken> stack(input.rbegin(), input.rend());
    size_t budget = 200000; // hard bound on work, so no input can make expansion run forever
    while (!stack.empty()) {
        if (--budget == 0) {
            m_diag.error(file, stack.back().line, "macro expansion too large");
            m_failed = true;
            break;
        }
        PPToken t = std::move(stack.back());
        stack.pop_back();
        if (t.kind != PPKind::Ident || t.noExpand || hidden(t)) {
            out.push_back(std::move(t));
            continue;
        }
        if (t.text == "__LINE__" || t.text == "__FILE__") {
            PPToken r;
            r.kind = t.text == "__LINE__" ? PPKind::Number : PPKind::String;
            r.text = t.text == "__LINE__" ? std::to_string(t.line) : "\"" + file + "\"";
            r.line = t.line;
            out.push_back(r);
            continue;
        }
        auto it = m_macros.find(t.text);
        if (it == m_macros.end()) {
            out.push_back(std::move(t));
            continue;
        }
        const Macro& m = it->second;
        HideSet hs = withName(t.hide, t.text);
        std::vector<PPToken> result;
        int swallowedNewlines = 0;
        if (!m.functionLike) {
            result = substitute(m, {}, file, t.line);
        } else {
            // Look past white space (and line breaks) for the argument list.
            size_t k = stack.size();
            while (k > 0 && isSpace(stack[k - 1])) --k;
            if (k == 0 || stack[k - 1].text != "(") {
                out.push_back(std::move(t));
                continue;
            }
            for (size_t q = stack.size(); q > k; --q)
                if (stack[q - 1].kind == PPKind::Newline)
                    swallowedNewlines += stack[q - 1].newlines;
            stack.resize(k - 1);
            std::vector<std::vector<PPToken>> args(1);
            int nest = 0;
            bool closed = false;
            while (!stack.empty()) {
                PPToken a = std::move(stack.back());
                stack.pop_back();
                if (a.kind == PPKind::Newline) {
                    swallowedNewlines += a.newlines;
                    a.kind = PPKind::Space;
                    a.text = " ";
                }
                if (a.kind == PPKind::Punct) {
                    if (a.text == "(") ++nest;
                    if (a.text == ")") {
                        if (nest == 0) {
                            closed = true;
                            break;
                        }
                        --nest;
                    }
                    if (a.text == "," && nest == 0 &&
                        !(m.variadic && args.size() == m.params.size())) {
                        args.emplace_back();
                        continue;
                    }
                }
                args.back().push_back(std::move(a));
            }
            if (!closed) {
                m_diag.error(file, t.line,
                             "unterminated argument list invoking macro \"" + t.text + "\"");
                m_failed = true;
                return out;
            }
            bool onlyEmpty =
                args.size() == 1 && std::all_of(args[0].begin(), args[0].end(), isSpace);
            size_t given = onlyEmpty && m.params.empty() ? 0 : args.size();
            bool okCount = given == m.params.size() ||
                           (m.variadic && given + 1 == m.params.size()) ||
                           (m.params.size() == 1 && onlyEmpty);
            if (!okCount) {
                m_diag.error(file, t.line,
                             "macro \"" + t.text + "\" requires " +
                                 std::to_string(m.params.size()) + " arguments, but " +
                                 std::to_string(given) + " given");
                m_failed = true;
                return out;
            }
            result = substitute(m, args, file, t.line);
        }
        for (auto& r : result) {
            r.hide = r.hide ? withName(r.hide, t.text) : hs;
            if (r.kind == PPKind::Ident && (r.hide->count(r.text))) r.noExpand = true;
        }
        for (int q = 0; q < swallowedNewlines; ++q) {
            PPToken nl;
            nl.kind = PPKind::Newline;
            nl.text = "\n";
            stack.push_back(nl);
        }
        // Keep the expansion apart from its neighbours when spelled out.
        PPToken sp;
        sp.kind = PPKind::Space;
        sp.text = " ";
        stack.push_back(sp);
        for (auto r = result.rbegin(); r != result.rend(); ++r) stack.push_back(std::move(*r));
    }
    return out;
}

} // namespace OSL::pvt
