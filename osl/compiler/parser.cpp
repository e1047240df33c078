// OSL grammar, from declarations down to primary expressions. Operator precedence follows the
// language: comma < assignment < ?: < || < && < | < ^ < & < equality < relational < shifts
// < additive < multiplicative < unary < postfix.
#include "parser.h"

#include <map>

namespace OSL::pvt {

namespace {
const std::set<std::string> kSimpleTypes = {"int",   "float",  "point",  "vector", "normal",
                                            "color", "matrix", "string", "void"};
const std::set<std::string> kShaderTypes = {"shader", "surface", "displacement", "volume", "light"};
const std::set<std::string> kReserved = {"break",   "continue", "do",    "else",   "for",
                                         "if",      "return",   "while", "struct", "output",
                                         "closure", "public",   "and",   "or",     "not"};
constexpr int kMaxDepth = 400;
} // namespace

const Token& Parser::peek(size_t ahead) const {
    size_t i = std::min(m_pos + ahead, m_toks.size() - 1);
    return m_toks[i];
}

const Token& Parser::next() {
    const Token& t = m_toks[m_pos];
    if (m_pos + 1 < m_toks.size()) ++m_pos;
    return t;
}

bool Parser::isPunct(const char* p, size_t ahead) const {
    const Token& t = peek(ahead);
    return t.kind == Tok::Punct && t.text == p;
}

bool Parser::isIdent(const char* word, size_t ahead) const {
    const Token& t = peek(ahead);
    return t.kind == Tok::Ident && t.text == word;
}

bool Parser::accept(const char* p) {
    if (isPunct(p)) {
        next();
        return true;
    }
    // `a[b[i]]` lexes its last two brackets as one `]]` token: take them one at a time.
    if (p[0] == ']' && !p[1] && isPunct("]]")) {
        const_cast<Token&>(peek()).text.resize(1);
        return true;
    }
    return false;
}

void Parser::expect(const char* p) {
    if (!accept(p)) fail(std::string("expected '") + p + "'");
}

void Parser::fail(const std::string& what) {
    const Token& t = peek();
    std::string got = t.kind == Tok::End         ? "end of file"
                      : t.kind == Tok::StringLit ? "string literal"
                                                 : "'" + t.text + "'";
    m_diag.error(m_files[t.file], t.line, "syntax error, unexpected " + got + " (" + what + ")");
    throw SyntaxError{};
}

NodePtr Parser::make(NodeKind k, const Token& at) {
    return std::make_unique<Node>(k, at.file, at.line);
}

std::string Parser::parseIdent() {
    if (peek().kind != Tok::Ident || kReserved.count(peek().text) ||
        kSimpleTypes.count(peek().text))
        fail("expected an identifier");
    return next().text;
}

bool Parser::isTypeStart(size_t ahead) const {
    const Token& t = peek(ahead);
    if (t.kind != Tok::Ident) return false;
    return kSimpleTypes.count(t.text) || t.text == "closure" || m_structNames.count(t.text);
}

TypeName Parser::parseType() {
    TypeName tn;
    if (isIdent("output")) {
        next();
        tn.isOutput = true;
    }
    if (isIdent("closure")) {
        next();
        tn.closure = true;
    }
    if (!isTypeStart()) fail("expected a type");
    tn.name = next().text;
    return tn;
}

bool Parser::parse(std::vector<NodePtr>& decls) {
    try {
        while (peek().kind != Tok::End) {
            if (accept(";")) continue;
            decls.push_back(topLevel());
        }
        return true;
    } catch (const SyntaxError&) {
        return false;
    }
}

NodePtr Parser::topLevel() {
    if (isIdent("struct")) return structDecl();
    if (peek().kind == Tok::Ident && kShaderTypes.count(peek().text) && !isPunct("(", 1))
        return functionOrShader(true);
    return functionOrShader(false);
}

NodePtr Parser::structDecl() {
    const Token& at = next();
    auto n = make(NodeKind::StructDecl, at);
    n->name = parseIdent();
    m_structNames.insert(n->name);
    expect("{");
    while (!accept("}")) {
        const Token& ft = peek();
        TypeName tn = parseType();
        n->kids.push_back(varDecl(tn, ft));
    }
    expect(";");
    return n;
}

void Parser::metadataBlock(std::vector<NodePtr>& out) {
    while (accept("[[")) {
        if (accept("]]")) continue;
        do {
            if (isPunct("]]")) break; // a trailing comma
            const Token& at = peek();
            auto m = make(NodeKind::Metadata, at);
            m->typeName = parseType();
            m->name = parseIdent();
            if (accept("[")) {
                m->typeName.arraylen = -1;
                if (peek().kind == Tok::IntLit) m->typeName.arraylen = int(next().intValue);
                expect("]");
            }
            expect("=");
            m->kids.push_back(initializer());
            out.push_back(std::move(m));
        } while (accept(","));
        expect("]]");
    }
}

NodePtr Parser::param(bool shaderParam) {
    const Token& at = peek();
    auto p = make(NodeKind::Param, at);
    if (accept("...")) { // library declarations: any further arguments
        p->typeName.name = "...";
        return p;
    }
    p->typeName = parseType();
    p->name = parseIdent();
    if (accept("[")) {
        p->typeName.arraylen = -1;
        if (!isPunct("]")) {
            if (peek().kind != Tok::IntLit) fail("expected an array length");
            p->typeName.arraylen = int(next().intValue);
        }
        expect("]");
    }
    if (accept("=")) p->kids.push_back(initializer());
    (void)shaderParam;
    metadataBlock(p->metadata);
    return p;
}

NodePtr Parser::functionOrShader(bool isShader) {
    const Token& at = peek();
    auto n = make(isShader ? NodeKind::ShaderDecl : NodeKind::FunctionDecl, at);
    if (isShader) {
        n->op = next().text;
    } else {
        n->typeName = parseType();
    }
    n->name = parseIdent();
    if (isShader) metadataBlock(n->metadata);
    expect("(");
    if (!isPunct(")")) {
        do {
            if (isPunct(")")) break; // tolerate a trailing comma
            n->kids.push_back(param(isShader));
        } while (accept(",") || (isShader && accept(";")));
    }
    expect(")");
    metadataBlock(n->metadata);
    if (accept(";")) return n; // a declaration without a body: a built-in
    n->body = block();
    return n;
}

NodePtr Parser::block() {
    const Token& at = peek();
    expect("{");
    auto b = make(NodeKind::Block, at);
    while (!accept("}")) {
        if (peek().kind == Tok::End) fail("expected '}'");
        b->kids.push_back(statement());
    }
    return b;
}

NodePtr Parser::initializer() {
    if (isPunct("{")) {
        const Token& at = next();
        auto l = make(NodeKind::InitList, at);
        if (!isPunct("}")) {
            do {
                if (isPunct("}")) break;
                l->kids.push_back(initializer());
            } while (accept(","));
        }
        expect("}");
        return l;
    }
    return assignment();
}

NodePtr Parser::varDecl(TypeName type, const Token& at) {
    auto d = make(NodeKind::VarDecl, at);
    d->typeName = type;
    do {
        const Token& nt = peek();
        auto v = make(NodeKind::Declarator, nt);
        v->name = parseIdent();
        v->typeName = type;
        if (accept("[")) {
            v->typeName.arraylen = -1;
            if (!isPunct("]")) {
                auto len = expression();
                v->kids.push_back(std::move(len)); // array length expression, resolved later
            }
            expect("]");
        }
        if (accept("=")) {
            if (v->kids.empty()) v->kids.push_back(make(NodeKind::Empty, nt));
            v->kids.push_back(initializer());
        }
        metadataBlock(v->metadata);
        d->kids.push_back(std::move(v));
    } while (accept(","));
    expect(";");
    return d;
}

NodePtr Parser::statement() {
    if (++m_depth > kMaxDepth) fail("nesting too deep");
    struct Guard {
        int& d;
        ~Guard() { --d; }
    } guard{m_depth};
    const Token& at = peek();
    if (isPunct("{")) return block();
    if (accept(";")) return make(NodeKind::Empty, at);
    if (at.kind == Tok::Ident) {
        if (at.text == "if") {
            next();
            auto n = make(NodeKind::If, at);
            expect("(");
            n->kids.push_back(expression());
            expect(")");
            n->kids.push_back(statement());
            if (isIdent("else")) {
                next();
                n->kids.push_back(statement());
            }
            return n;
        }
        if (at.text == "while") {
            next();
            auto n = make(NodeKind::Loop, at);
            n->loop = LoopKind::While;
            expect("(");
            n->kids.push_back(make(NodeKind::Empty, at));
            n->kids.push_back(expression());
            expect(")");
            n->kids.push_back(make(NodeKind::Empty, at));
            n->kids.push_back(statement());
            return n;
        }
        if (at.text == "do") {
            next();
            auto n = make(NodeKind::Loop, at);
            n->loop = LoopKind::DoWhile;
            auto body = statement();
            if (!isIdent("while")) fail("expected 'while'");
            next();
            expect("(");
            n->kids.push_back(make(NodeKind::Empty, at));
            n->kids.push_back(expression());
            expect(")");
            expect(";");
            n->kids.push_back(make(NodeKind::Empty, at));
            n->kids.push_back(std::move(body));
            return n;
        }
        if (at.text == "for") {
            next();
            auto n = make(NodeKind::Loop, at);
            n->loop = LoopKind::For;
            expect("(");
            if (accept(";")) {
                n->kids.push_back(make(NodeKind::Empty, at));
            } else if (isTypeStart() && !isPunct("(", 1)) {
                const Token& tt = peek();
                TypeName tn = parseType();
                n->kids.push_back(varDecl(tn, tt));
            } else {
                auto e = make(NodeKind::ExprStmt, peek());
                e->kids.push_back(expression());
                expect(";");
                n->kids.push_back(std::move(e));
            }
            n->kids.push_back(isPunct(";") ? make(NodeKind::Empty, at) : expression());
            expect(";");
            n->kids.push_back(isPunct(")") ? make(NodeKind::Empty, at) : expression());
            expect(")");
            n->kids.push_back(statement());
            return n;
        }
        if (at.text == "break" || at.text == "continue") {
            next();
            expect(";");
            return make(at.text == "break" ? NodeKind::Break : NodeKind::Continue, at);
        }
        if (at.text == "return") {
            next();
            auto n = make(NodeKind::Return, at);
            if (!isPunct(";")) n->kids.push_back(expression());
            expect(";");
            return n;
        }
        if (isTypeStart()) {
            size_t k = at.text == "closure" ? 2 : 1; // the token after the type
            if (peek(k).kind == Tok::Ident && isPunct("(", k + 1)) return functionOrShader(false);
            if (peek(k).kind == Tok::Ident) {
                TypeName tn = parseType();
                return varDecl(tn, at);
            }
        }
        if (at.text == "struct") return structDecl();
    }
    auto n = make(NodeKind::ExprStmt, at);
    n->kids.push_back(expression());
    expect(";");
    return n;
}

NodePtr Parser::expression() {
    const Token& at = peek();
    auto e = assignment();
    if (!isPunct(",")) return e;
    auto c = make(NodeKind::Comma, at);
    c->kids.push_back(std::move(e));
    while (accept(",")) c->kids.push_back(assignment());
    return c;
}

NodePtr Parser::assignment() {
    if (++m_depth > kMaxDepth) fail("expression nested too deeply");
    struct Guard {
        int& d;
        ~Guard() { --d; }
    } guard{m_depth};
    auto lhs = ternary();
    static const std::set<std::string> ops = {
        "=", "+=", "-=", "*=", "/=", "%=", "&=", "|=", "^=", "<<=", ">>="};
    const Token& t = peek();
    if (t.kind == Tok::Punct && ops.count(t.text)) {
        next();
        auto a = make(NodeKind::Assign, t);
        a->line = lhs->line;
        a->op = t.text;
        a->kids.push_back(std::move(lhs));
        a->kids.push_back(isPunct("{") ? initializer() : assignment());
        return a;
    }
    return lhs;
}

NodePtr Parser::ternary() {
    auto c = binary(1);
    if (!isPunct("?")) return c;
    const Token& at = next();
    auto t = make(NodeKind::Ternary, at);
    t->line = c->line;
    t->kids.push_back(std::move(c));
    t->kids.push_back(assignment());
    expect(":");
    t->kids.push_back(assignment());
    return t;
}

static int binaryPrecedence(const Token& t, std::string& op) {
    static const std::map<std::string, int> prec = {
        {"||", 1}, {"&&", 2}, {"|", 3}, {"^", 4},  {"&", 5},  {"==", 6},
        {"!=", 6}, {"<", 7},  {">", 7}, {"<=", 7}, {">=", 7}, {"<<", 8},
        {">>", 8}, {"+", 9},  {"-", 9}, {"*", 10}, {"/", 10}, {"%", 10}};
    op = t.text;
    if (t.kind == Tok::Ident) {
        if (t.text == "and")
            op = "&&";
        else if (t.text == "or")
            op = "||";
        else
            return -1;
    } else if (t.kind != Tok::Punct) {
        return -1;
    }
    auto it = prec.find(op);
    return it == prec.end() ? -1 : it->second;
}

NodePtr Parser::binary(int minPrec) {
    auto lhs = unary();
    for (;;) {
        std::string op;
        int p = binaryPrecedence(peek(), op);
        if (p < minPrec) return lhs;
        const Token& at = next();
        auto rhs = binary(p + 1);
        auto b = make(NodeKind::Binary, at);
        b->op = op;
        b->kids.push_back(std::move(lhs));
        b->kids.push_back(std::move(rhs));
        lhs = std::move(b);
    }
}

NodePtr Parser::unary() {
    if (++m_depth > kMaxDepth) fail("expression nested too deeply");
    struct Guard {
        int& d;
        ~Guard() { --d; }
    } guard{m_depth};
    const Token& t = peek();
    if (t.kind == Tok::Punct &&
        (t.text == "-" || t.text == "+" || t.text == "!" || t.text == "~")) {
        next();
        auto u = make(NodeKind::Unary, t);
        u->op = t.text;
        u->kids.push_back(unary());
        return u;
    }
    if (isIdent("not")) {
        next();
        auto u = make(NodeKind::Unary, t);
        u->op.assign(1, '!');
        u->kids.push_back(unary());
        return u;
    }
    if (t.kind == Tok::Punct && (t.text == "++" || t.text == "--")) {
        next();
        auto u = make(NodeKind::PreIncDec, t);
        u->op = t.text;
        u->kids.push_back(unary());
        return u;
    }
    // A C-style cast: `(type) expr`.
    if (isPunct("(") && isTypeStart(1) && isPunct(")", 2)) {
        next();
        auto c = make(NodeKind::TypeCtor, t);
        c->typeName = parseType();
        expect(")");
        c->isCast = true;
        c->kids.push_back(unary());
        return c;
    }
    return postfix(primary());
}

NodePtr Parser::postfix(NodePtr e) {
    for (;;) {
        const Token& t = peek();
        if (isPunct("[")) {
            next();
            auto ix = make(NodeKind::Index, t);
            ix->line = e->line;
            ix->kids.push_back(std::move(e));
            ix->kids.push_back(expression());
            expect("]");
            e = std::move(ix);
        } else if (isPunct(".")) {
            next();
            auto f = make(NodeKind::Field, t);
            f->line = e->line;
            f->kids.push_back(std::move(e));
            if (peek().kind != Tok::Ident) fail("expected a field name");
            f->name = next().text;
            e = std::move(f);
        } else if (isPunct("++") || isPunct("--")) {
            next();
            auto u = make(NodeKind::PostIncDec, t);
            u->op = t.text;
            u->kids.push_back(std::move(e));
            e = std::move(u);
        } else {
            return e;
        }
    }
}

NodePtr Parser::primary() {
    const Token& t = peek();
    switch (t.kind) {
    case Tok::IntLit: {
        next();
        auto n = make(NodeKind::IntLit, t);
        n->intValue = t.intValue;
        return n;
    }
    case Tok::FloatLit: {
        next();
        auto n = make(NodeKind::FloatLit, t);
        n->floatValue = t.floatValue;
        return n;
    }
    case Tok::StringLit: {
        auto n = make(NodeKind::StringLit, t);
        while (peek().kind == Tok::StringLit) n->stringValue += next().text;
        return n;
    }
    case Tok::Ident: {
        if (isTypeStart() && (isPunct("(", 1) || (t.text == "closure" && isPunct("(", 2)))) {
            auto c = make(NodeKind::TypeCtor, t);
            c->typeName = parseType();
            if (m_structNames.count(c->typeName.name)) {
                c->kind = NodeKind::Call; // struct constructor: resolved like a call
                c->name = c->typeName.name;
            }
            expect("(");
            if (!isPunct(")")) {
                do c->kids.push_back(assignment());
                while (accept(","));
            }
            expect(")");
            return c;
        }
        if (kReserved.count(t.text) || kSimpleTypes.count(t.text)) fail("expected an expression");
        next();
        if (isPunct("(")) {
            next();
            auto c = make(NodeKind::Call, t);
            c->name = t.text;
            if (!isPunct(")")) {
                do c->kids.push_back(assignment());
                while (accept(","));
            }
            expect(")");
            return c;
        }
        auto v = make(NodeKind::VarRef, t);
        v->name = t.text;
        return v;
    }
    case Tok::Punct:
        if (t.text == "(") {
            next();
            auto e = expression();
            expect(")");
            e->parenthesized = true;
            return e;
        }
        if (t.text == "{") return initializer();
        break;
    default:
        break;
    }
    fail("expected an expression");
}

} // namespace OSL::pvt
