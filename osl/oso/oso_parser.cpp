// The OSO 1.00 grammar, written by hand: header line, shader line, symbol lines, then code
// sections of instructions. Parsing runs in two passes: the first checks every line and records
// it; the second registers declared structs and makes the reader's callbacks in file order.
#include "oso_parser.h"

#include "oso_tokenizer.h"
#include "struct_registry.h"

#include <OpenImageIO/strutil.h>

#include <map>
#include <optional>
#include <variant>

namespace OSL {

namespace {

using oso::Token;
using oso::TokenKind;

// Longest array the reader accepts: beyond it a query's default storage would be unreasonably
// large, and no real shader comes close.
constexpr int kMaxArrayLength = 1 << 16;

// Struct nesting deeper than this is treated as malformed (it also bounds recursion).
constexpr int kMaxStructDepth = 64;

struct VersionLine {
    std::string specid;
    int major = 0, minor = 0;
};

struct ShaderLine {
    std::string shadertype, name;
    std::vector<std::string_view> hints;
};

struct SymbolLine {
    SymType symtype = SymTypeLocal;
    enum class Base { Simple, Closure, Struct } base = Base::Simple;
    TypeDesc simple;
    std::string structname;
    int arraylen = 0;
    std::string name;
    std::vector<std::variant<int, float, std::string>> defaults;
    std::vector<std::string_view> hints;
    int structid = 0; // filled between the passes
};

struct CodeLine {
    std::string name;
};

struct InstructionLine {
    int label = -1;
    std::string opcode;
    std::vector<std::string> args;
    std::vector<int> jumps;
    std::vector<std::string_view> hints;
};

struct Line {
    int lineno = 0;
    std::variant<VersionLine, ShaderLine, SymbolLine, CodeLine, InstructionLine> content;
};

std::optional<SymType> symtype_from_keyword(std::string_view word) {
    if (word == "param") return SymTypeParam;
    if (word == "oparam") return SymTypeOutputParam;
    if (word == "local") return SymTypeLocal;
    if (word == "temp") return SymTypeTemp;
    if (word == "global") return SymTypeGlobal;
    if (word == "const") return SymTypeConst;
    return std::nullopt;
}

std::optional<TypeDesc> simple_type_from_keyword(std::string_view word) {
    if (word == "int") return TypeDesc(TypeDesc::TypeInt);
    if (word == "float") return TypeDesc(TypeDesc::TypeFloat);
    if (word == "color") return TypeDesc(TypeDesc::TypeColor);
    if (word == "point") return TypeDesc(TypeDesc::TypePoint);
    if (word == "vector") return TypeDesc(TypeDesc::TypeVector);
    if (word == "normal") return TypeDesc(TypeDesc::TypeNormal);
    if (word == "matrix") return TypeDesc(TypeDesc::TypeMatrix);
    if (word == "string") return TypeDesc(TypeDesc::TypeString);
    if (word == "void") return TypeDesc(TypeDesc::NONE);
    return std::nullopt;
}

// Walks the tokens of one line.
class TokenCursor {
public:
    explicit TokenCursor(const std::vector<Token>& tokens) : m_tokens(tokens) {}
    bool done() const { return m_pos >= m_tokens.size(); }
    const Token* peek() const { return done() ? nullptr : &m_tokens[m_pos]; }
    bool at(TokenKind kind) const { return !done() && m_tokens[m_pos].kind == kind; }
    const Token& next() { return m_tokens[m_pos++]; }

private:
    const std::vector<Token>& m_tokens;
    size_t m_pos = 0;
};

// The value of a `%name{...}` hint between its braces, or nullopt for another hint.
std::optional<std::string_view> hint_body(std::string_view hint, std::string_view name) {
    if (hint.size() < name.size() + 3 || hint[0] != '%' || hint.substr(1, name.size()) != name ||
        hint[name.size() + 1] != '{' || hint.back() != '}')
        return std::nullopt;
    return hint.substr(name.size() + 2, hint.size() - name.size() - 3);
}

// One field type of a `%structfieldtypes` code: a simple or closure type, or a nested struct
// (whose identity the code does not tell; it is found from the field's own symbol).
struct FieldCode {
    bool nested = false;
    TypeSpec type;
};

// Decodes a field type code string as the compiler writes it ("fi[5]p", "S1fc", "Cc").
std::optional<std::vector<FieldCode>> decode_field_types(std::string_view code) {
    std::vector<FieldCode> out;
    size_t i = 0;
    while (i < code.size()) {
        FieldCode f;
        const char c = code[i++];
        switch (c) {
        case 'i':
            f.type = TypeDesc(TypeDesc::TypeInt);
            break;
        case 'f':
            f.type = TypeDesc(TypeDesc::TypeFloat);
            break;
        case 'c':
            f.type = TypeDesc(TypeDesc::TypeColor);
            break;
        case 'p':
            f.type = TypeDesc(TypeDesc::TypePoint);
            break;
        case 'v':
            f.type = TypeDesc(TypeDesc::TypeVector);
            break;
        case 'n':
            f.type = TypeDesc(TypeDesc::TypeNormal);
            break;
        case 'm':
            f.type = TypeDesc(TypeDesc::TypeMatrix);
            break;
        case 's':
            f.type = TypeDesc(TypeDesc::TypeString);
            break;
        case 'x':
            f.type = TypeDesc(TypeDesc::NONE);
            break;
        case 'C':
            f.type = TypeSpec(TypeDesc(TypeDesc::TypeColor), true);
            break;
        case 'S':
            f.nested = true;
            while (i < code.size() && code[i] >= '0' && code[i] <= '9') ++i;
            break;
        default:
            return std::nullopt;
        }
        if (i < code.size() && code[i] == '[') {
            const size_t close = code.find(']', i);
            if (close == std::string_view::npos) return std::nullopt;
            int len = -1;
            if (close > i + 1) {
                len = 0;
                for (size_t k = i + 1; k < close; ++k) {
                    if (code[k] < '0' || code[k] > '9' || len > kMaxArrayLength)
                        return std::nullopt;
                    len = len * 10 + (code[k] - '0');
                }
            }
            f.type.make_array(len);
            i = close + 1;
        }
        out.push_back(f);
    }
    return out;
}

std::vector<std::string> split_fields(std::string_view body) {
    std::vector<std::string> names;
    for (std::string_view part : OIIO::Strutil::splitsv(body, ","))
        names.emplace_back(OIIO::Strutil::strip(part));
    if (names.size() == 1 && names[0].empty()) names.clear();
    return names;
}

// Registers (or finds) the structs that the symbol lines declare. Struct types are registered
// under "<shader>_<struct>" so that same-named structs of different shaders stay apart; a struct
// whose fields match an earlier registration reuses it.
class StructResolver {
public:
    StructResolver(std::vector<Line>& lines, std::string shadername)
        : m_shadername(std::move(shadername)) {
        for (Line& line : lines)
            if (auto* sym = std::get_if<SymbolLine>(&line.content))
                if (sym->base == SymbolLine::Base::Struct) {
                    m_all.push_back(sym);
                    m_struct_symbols.emplace(sym->name, sym);
                }
    }

    // Fills structid of every struct symbol; false with `error` when the registry is full.
    bool resolve(std::string& error) {
        for (SymbolLine* sym : m_all) {
            if (!id_for(*sym, 0)) {
                error = "too many struct types";
                return false;
            }
        }
        return true;
    }

private:
    int id_for(SymbolLine& sym, int depth) {
        if (sym.structid) return sym.structid;
        const std::string regname = m_shadername + "_" + sym.structname;
        std::vector<std::string> names;
        std::optional<std::vector<FieldCode>> codes;
        for (std::string_view h : sym.hints) {
            if (auto body = hint_body(h, "structfields"))
                names = split_fields(*body);
            else if (auto types = hint_body(h, "structfieldtypes"))
                codes = decode_field_types(OIIO::Strutil::strip(*types, "\""));
        }
        if (names.empty()) {
            sym.structid = TypeSpec::structure_id(regname.c_str(), true);
            return sym.structid;
        }
        auto spec = std::make_unique<StructSpec>(ustring(regname), 0);
        for (size_t f = 0; f < names.size(); ++f) {
            TypeSpec type;
            if (codes && f < codes->size()) {
                const FieldCode& code = (*codes)[f];
                type = code.type;
                if (code.nested)
                    type = nested_type(sym.name + "." + names[f], code.type.arraylength(), depth);
            }
            spec->add_field(type, ustring(names[f]));
        }
        sym.structid = find_or_register_struct(std::move(spec));
        return sym.structid;
    }

    TypeSpec nested_type(const std::string& fieldsym, int arraylen, int depth) {
        auto it = m_struct_symbols.find(fieldsym);
        if (it == m_struct_symbols.end() || depth >= kMaxStructDepth) return TypeSpec();
        const int id = id_for(*it->second, depth + 1);
        return id ? TypeSpec("", id, arraylen) : TypeSpec();
    }

    std::string m_shadername;
    std::vector<SymbolLine*> m_all;
    std::map<std::string, SymbolLine*> m_struct_symbols;
};

// The first pass: checks every line against the grammar and records it.
class LineParser {
public:
    explicit LineParser(std::string_view text) : m_text(text) {}

    bool run(std::vector<Line>& lines, int& error_line, std::string& error) {
        size_t pos = 0;
        int lineno = 0;
        std::vector<Token> tokens;
        bool ended = false; // the last instruction seen is `end`
        while (pos < m_text.size()) {
            size_t eol = m_text.find('\n', pos);
            if (eol == std::string_view::npos) eol = m_text.size();
            const std::string_view text = m_text.substr(pos, eol - pos);
            pos = eol + 1;
            ++lineno;
            error_line = lineno;
            if (text.find('\0') != std::string_view::npos) {
                error = "NUL character in text";
                return false;
            }
            if (!oso::tokenize_line(text, tokens, error)) return false;
            if (tokens.empty()) continue;
            Line line;
            line.lineno = lineno;
            TokenCursor cur(tokens);
            bool ok = false;
            switch (m_state) {
            case State::Version:
                ok = parse_version(cur, line, error);
                break;
            case State::Shader:
                ok = parse_shader(cur, line, error);
                break;
            case State::Symbols:
            case State::Code:
                ok = parse_body_line(cur, line, error);
                break;
            }
            if (!ok) return false;
            if (!cur.done()) {
                error = "unexpected '" + std::string(cur.peek()->text) + "'";
                return false;
            }
            if (auto* inst = std::get_if<InstructionLine>(&line.content))
                ended = inst->opcode == "end";
            else if (std::holds_alternative<CodeLine>(line.content))
                ended = false;
            lines.push_back(std::move(line));
        }
        error_line = lineno;
        if (m_state != State::Code) {
            error = m_state == State::Version  ? "empty text, no OSO header"
                    : m_state == State::Shader ? "missing shader declaration"
                                               : "missing code section";
            return false;
        }
        if (!ended) {
            error = "code does not finish with 'end' (truncated?)";
            return false;
        }
        return true;
    }

private:
    enum class State { Version, Shader, Symbols, Code };

    bool parse_version(TokenCursor& cur, Line& line, std::string& error) {
        VersionLine v;
        if (!cur.at(TokenKind::Identifier)) {
            error = "expected the OSO header";
            return false;
        }
        v.specid = cur.next().text;
        if (!cur.at(TokenKind::Float) && !cur.at(TokenKind::Int)) {
            error = "expected a version number after '" + v.specid + "'";
            return false;
        }
        const float version = cur.next().fval;
        if (!(version >= 0.0f && version < 1000.0f)) {
            error = "version number out of range";
            return false;
        }
        v.major = (int)version;
        v.minor = (int)(100.0f * (version - (float)v.major) + 0.5f);
        line.content = std::move(v);
        m_state = State::Shader;
        return true;
    }

    bool parse_shader(TokenCursor& cur, Line& line, std::string& error) {
        ShaderLine s;
        if (!cur.at(TokenKind::Identifier)) {
            error = "expected the shader type";
            return false;
        }
        s.shadertype = cur.next().text;
        if (!cur.at(TokenKind::Identifier)) {
            error = "expected the shader name";
            return false;
        }
        s.name = cur.next().text;
        read_hints(cur, s.hints);
        line.content = std::move(s);
        m_state = State::Symbols;
        return true;
    }

    bool parse_body_line(TokenCursor& cur, Line& line, std::string& error) {
        const Token* first = cur.peek();
        if (first->kind == TokenKind::Identifier && first->text == "code") {
            cur.next();
            if (!cur.at(TokenKind::Identifier)) {
                error = "expected a code section name";
                return false;
            }
            line.content = CodeLine{std::string(cur.next().text)};
            m_state = State::Code;
            return true;
        }
        if (first->kind == TokenKind::Identifier) {
            if (auto symtype = symtype_from_keyword(first->text)) {
                if (m_state == State::Code) {
                    error = "symbol '" + std::string(first->text) + "' declared after the code";
                    return false;
                }
                cur.next();
                return parse_symbol(*symtype, cur, line, error);
            }
        }
        if (m_state != State::Code) {
            error = "expected a symbol or a code section, not '" + std::string(first->text) + "'";
            return false;
        }
        return parse_instruction(cur, line, error);
    }

    bool parse_symbol(SymType symtype, TokenCursor& cur, Line& line, std::string& error) {
        SymbolLine s;
        s.symtype = symtype;
        if (!cur.at(TokenKind::Identifier)) {
            error = "expected a type";
            return false;
        }
        std::string_view word = cur.next().text;
        if (word == "struct") {
            if (!cur.at(TokenKind::Identifier)) {
                error = "expected a struct name";
                return false;
            }
            s.base = SymbolLine::Base::Struct;
            s.structname = cur.next().text;
        } else {
            if (word == "closure") {
                s.base = SymbolLine::Base::Closure;
                if (!cur.at(TokenKind::Identifier)) {
                    error = "expected a type after 'closure'";
                    return false;
                }
                word = cur.next().text;
            }
            auto simple = simple_type_from_keyword(word);
            if (!simple) {
                error = "unknown type '" + std::string(word) + "'";
                return false;
            }
            s.simple = *simple;
        }
        if (cur.at(TokenKind::LeftBracket)) {
            cur.next();
            s.arraylen = -1;
            if (cur.at(TokenKind::Int)) {
                s.arraylen = cur.next().ival;
                if (s.arraylen <= 0 || s.arraylen > kMaxArrayLength) {
                    error = "bad array length " + std::to_string(s.arraylen);
                    return false;
                }
            }
            if (!cur.at(TokenKind::RightBracket)) {
                error = "expected ']'";
                return false;
            }
            cur.next();
        }
        if (!cur.at(TokenKind::Identifier)) {
            error = "expected a symbol name";
            return false;
        }
        s.name = cur.next().text;
        while (const Token* t = cur.peek()) {
            float special = 0.0f;
            if (t->kind == TokenKind::Int)
                s.defaults.emplace_back(t->ival);
            else if (t->kind == TokenKind::Float)
                s.defaults.emplace_back(t->fval);
            else if (t->kind == TokenKind::String)
                s.defaults.emplace_back(t->str);
            else if (t->kind == TokenKind::Identifier && oso::special_float(t->text, special))
                s.defaults.emplace_back(special);
            else
                break;
            cur.next();
        }
        read_hints(cur, s.hints);
        line.content = std::move(s);
        return true;
    }

    bool parse_instruction(TokenCursor& cur, Line& line, std::string& error) {
        InstructionLine inst;
        if (cur.at(TokenKind::Int)) {
            inst.label = cur.next().ival;
            if (!cur.at(TokenKind::Colon)) {
                error = "expected ':' after an instruction label";
                return false;
            }
            cur.next();
        }
        if (!cur.at(TokenKind::Identifier)) {
            error = "expected an instruction";
            return false;
        }
        inst.opcode = cur.next().text;
        while (cur.at(TokenKind::Identifier)) inst.args.emplace_back(cur.next().text);
        while (cur.at(TokenKind::Int)) inst.jumps.push_back(cur.next().ival);
        read_hints(cur, inst.hints);
        line.content = std::move(inst);
        return true;
    }

    static void read_hints(TokenCursor& cur, std::vector<std::string_view>& hints) {
        while (cur.at(TokenKind::Hint)) hints.push_back(cur.next().text);
    }

    std::string_view m_text;
    State m_state = State::Version;
};

} // namespace

OSOParser::OSOParser(OSOReader& reader, std::string_view text, std::string source)
    : m_reader(reader), m_text(text), m_source(std::move(source)) {}

bool OSOParser::parse() {
    std::vector<Line> lines;
    int error_line = 0;
    std::string error;
    LineParser checker(m_text);
    if (!checker.run(lines, error_line, error)) {
        m_reader.m_lineno = error_line;
        m_reader.errhandler().error(
            OIIO::Strutil::fmt::format("{}:{}: error: {}", m_source, error_line, error));
        return false;
    }

    std::string shadername;
    for (const Line& line : lines)
        if (auto* s = std::get_if<ShaderLine>(&line.content)) shadername = s->name;
    StructResolver structs(lines, shadername);
    if (!structs.resolve(error)) {
        m_reader.errhandler().error(OIIO::Strutil::fmt::format("{}: error: {}", m_source, error));
        return false;
    }

    bool in_code = false;
    for (const Line& line : lines) {
        m_reader.m_lineno = line.lineno;
        if (auto* v = std::get_if<VersionLine>(&line.content)) {
            m_reader.version(v->specid.c_str(), v->major, v->minor);
        } else if (auto* s = std::get_if<ShaderLine>(&line.content)) {
            m_reader.shader(s->shadertype.c_str(), s->name.c_str());
            for (std::string_view h : s->hints) m_reader.hint(h);
        } else if (auto* sym = std::get_if<SymbolLine>(&line.content)) {
            if (sym->symtype == SymTypeTemp && m_reader.stop_parsing_at_temp_symbols()) return true;
            TypeSpec type;
            switch (sym->base) {
            case SymbolLine::Base::Simple:
                type = TypeSpec(sym->simple);
                break;
            case SymbolLine::Base::Closure:
                type = TypeSpec(sym->simple, true);
                break;
            case SymbolLine::Base::Struct:
                type = TypeSpec("", sym->structid);
                break;
            }
            if (sym->arraylen) type.make_array(sym->arraylen);
            m_reader.symbol(sym->symtype, type, sym->name.c_str());
            for (const auto& def : sym->defaults) {
                if (auto* i = std::get_if<int>(&def))
                    m_reader.symdefault(*i);
                else if (auto* f = std::get_if<float>(&def))
                    m_reader.symdefault(*f);
                else
                    m_reader.symdefault(std::get<std::string>(def).c_str());
            }
            for (std::string_view h : sym->hints) m_reader.hint(h);
            if (sym->symtype == SymTypeParam || sym->symtype == SymTypeOutputParam)
                m_reader.parameter_done();
        } else if (auto* code = std::get_if<CodeLine>(&line.content)) {
            if (!m_reader.parse_code_section()) return true;
            m_reader.codemarker(code->name.c_str());
            in_code = true;
        } else if (auto* inst = std::get_if<InstructionLine>(&line.content)) {
            m_reader.instruction(inst->label, inst->opcode.c_str());
            for (const std::string& a : inst->args) m_reader.instruction_arg(a.c_str());
            for (int j : inst->jumps) m_reader.instruction_jump(j);
            for (std::string_view h : inst->hints) m_reader.hint(h);
            m_reader.instruction_end();
        }
    }
    if (in_code) m_reader.codeend();
    return true;
}

} // namespace OSL
