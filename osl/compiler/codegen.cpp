// Declarations and symbols of the code generator: scopes, constants, structs, functions and
// shader parameters. Statements, expressions, struct values and calls have files of their own.
#include "codegen.h"
#include "codegen_internal.h"

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <functional>

namespace OSL::pvt {

std::string FunctionSymbol::signature() const {
    std::string s = ret.string() + " " + name + " (";
    for (size_t i = 0; i < params.size(); ++i) {
        if (i) s += ", ";
        if (params[i].output) s += "output ";
        s += params[i].type.string();
    }
    if (variadic) s += params.empty() ? "..." : ", ...";
    return s + ")";
}

CodeGen::CodeGen(Diagnostics& diag, const std::vector<std::string>& files)
    : m_diag(diag), m_files(files) {
    m_nonWritableGlobals = {"u",    "v",     "I",       "Ng",   "dPdu", "dPdv", "Ps",
                            "time", "dtime", "dPdtime", "dPdx", "dPdy", "dPdz"};
}

CodeGen::~CodeGen() = default;

const std::string& CodeGen::fileOf(const Node* n) const {
    static const std::string none;
    return n && size_t(n->file) < m_files.size() ? m_files[n->file] : none;
}

void CodeGen::error(const Node* at, const std::string& msg) {
    if (m_silent) return;
    m_diag.error(fileOf(at), at ? at->line : 0, msg);
}

void CodeGen::warning(const Node* at, const std::string& msg) {
    if (m_silent) return;
    m_diag.warning(fileOf(at), at ? at->line : 0, msg);
}

TypeSpec CodeGen::resolveType(const TypeName& tn, const Node* at) {
    static const std::map<std::string, TypeDesc> simple = {
        {"int", TypeDesc::TypeInt},        {"float", TypeDesc::TypeFloat},
        {"point", TypeDesc::TypePoint},    {"vector", TypeDesc::TypeVector},
        {"normal", TypeDesc::TypeNormal},  {"color", TypeDesc::TypeColor},
        {"matrix", TypeDesc::TypeMatrix},  {"string", TypeDesc::TypeString},
        {"void", TypeDesc(TypeDesc::NONE)}};
    TypeSpec t;
    auto it = simple.find(tn.name);
    if (it != simple.end()) {
        t = tn.closure ? TypeSpec(it->second, true) : TypeSpec(it->second);
    } else {
        auto st = m_structs.find(tn.name);
        if (st == m_structs.end()) {
            error(at, "Unknown type '" + tn.name + "'");
            return TypeSpec(TypeDesc::TypeFloat);
        }
        t = TypeSpec(tn.name.c_str(), st->second);
    }
    if (tn.arraylen) t.make_array(tn.arraylen);
    return t;
}

Symbol* CodeGen::newSymbol(const std::string& name, const TypeSpec& t, SymType st) {
    m_pool.push_back(std::make_unique<Symbol>());
    Symbol* s = m_pool.back().get();
    s->name = name;
    s->type = t;
    s->symtype = st;
    if (!m_checkOnly) m_symbols.push_back(s);
    return s;
}

Symbol* CodeGen::newStructSymbol(const std::string& name, const TypeSpec& t, SymType st) {
    Symbol* s = newSymbol(name, t, st);
    if (!t.is_structure_based()) return s;
    StructSpec* spec = t.structspec();
    for (int i = 0; spec && i < spec->numfields(); ++i) {
        TypeSpec ft = spec->field(i).type;
        if (t.is_array()) {
            if (ft.is_structure_based())
                ft = TypeSpec(spec->field(i).type.structspec()->name().c_str(), ft.structure(),
                              t.arraylength());
            else
                ft.make_array(t.arraylength());
        }
        Symbol* f = newStructSymbol(name + "." + spec->field(i).name.string(), ft, st);
        f->structParent = s;
        f->fieldIndex = i;
        s->fields.push_back(f);
    }
    return s;
}

Symbol* CodeGen::viewAs(Symbol* s, const TypeSpec& t) {
    m_pool.push_back(std::make_unique<Symbol>(*s));
    Symbol* v = m_pool.back().get();
    v->type = t;
    v->fields.clear();
    v->aliasOf = s;
    return v;
}

Symbol* CodeGen::temp(const TypeSpec& t) {
    Symbol* s = newStructSymbol("$tmp" + std::to_string(++m_tmpCount), t, SymTypeTemp);
    s->bornAt = nextOp();
    return s;
}

Symbol* CodeGen::constant(const TypeSpec& t, const std::vector<int>& iv,
                          const std::vector<float>& fv, const std::vector<std::string>& sv) {
    std::string key = t.string() + "|";
    for (int i : iv) key += std::to_string(i) + ",";
    for (float f : fv) {
        char buf[32];
        std::snprintf(buf, sizeof buf, "%a,", f);
        key += buf;
    }
    for (const auto& s : sv) key += std::to_string(s.size()) + ":" + s + ",";
    auto it = m_constCache.find(key);
    if (it != m_constCache.end()) {
        if (!m_checkOnly &&
            std::find(m_symbols.begin(), m_symbols.end(), it->second) == m_symbols.end())
            m_symbols.push_back(it->second);
        return it->second;
    }
    Symbol* s = newSymbol("$const" + std::to_string(++m_constCount), t, SymTypeConst);
    s->ivals = iv;
    s->fvals = fv;
    s->svals = sv;
    m_constCache[key] = s;
    return s;
}

Symbol* CodeGen::constInt(int v) {
    return constant(TypeSpec(TypeDesc::TypeInt), {v}, {}, {});
}
Symbol* CodeGen::constFloat(float v) {
    return constant(TypeSpec(TypeDesc::TypeFloat), {}, {v}, {});
}
Symbol* CodeGen::constString(const std::string& s) {
    return constant(TypeSpec(TypeDesc::TypeString), {}, {}, {s});
}

void CodeGen::pushScope() {
    m_scopes.emplace_back();
    m_scopes.back().id = ++m_nextScopeId;
}

void CodeGen::popScope() {
    m_scopes.pop_back();
}

std::string CodeGen::scopedName(const std::string& name) {
    if (int(m_scopes.size()) - 1 == m_shaderScopeDepth) return name;
    return "___" + std::to_string(m_scopes.back().id) + "_" + name;
}

// Names starting with three underscores are the compiler's own (scoped and inlined names).
static std::string underscores(const std::string& name) {
    std::string msg(1, '"');
    msg += name;
    msg += "\" : sorry, can't start with three underscores";
    return msg;
}

// `"name" already declared in this scope`, built piecewise: GCC 12 falsely reports an
// overlapping copy for "\"" + name.
static std::string alreadyDeclared(const std::string& name) {
    std::string msg(1, '"');
    msg += name;
    msg += "\" already declared in this scope";
    return msg;
}

// Names are unique within a scope. The shader's parameters and the top level of its body share
// the global scope with every function, as in oslc: there a name that is already a function is
// an error, except for a parameter, which only gets a warning. The shader globals live there
// too, so a parameter or top-level local named `v` or `P` is an error as well.
void CodeGen::declare(const std::string& name, Symbol* s, const Node* at) {
    Scope& scope = m_scopes.back();
    auto previousAt = [&](const std::string& file, int line) {
        return "\n\t\tprevious declaration was at " +
               std::filesystem::path(file).filename().string() + ":" + std::to_string(line);
    };
    const std::string clash = alreadyDeclared(name);
    if (name.rfind("___", 0) == 0) error(at, underscores(name));
    if (scope.vars.count(name)) {
        const Node* prior = scope.declaredAt[name];
        error(at, prior ? clash + previousAt(fileOf(prior), prior->line) : clash);
        return;
    }
    if (int(m_scopes.size()) - 1 == m_shaderScopeDepth) {
        if (isGlobalName(name)) {
            error(at, clash);
            return;
        }
        auto fn = m_functions.find(name);
        if (fn != m_functions.end() && !fn->second.empty()) {
            const FunctionSymbol* last = fn->second.back().get();
            std::string msg = clash + previousAt(last->file, last->line);
            if (s->symtype == SymTypeParam || s->symtype == SymTypeOutputParam)
                warning(at, msg);
            else
                error(at, msg);
        }
    }
    scope.vars[name] = s;
    scope.declaredAt[name] = at;
}

Symbol* CodeGen::lookupVar(const std::string& name) {
    for (auto it = m_scopes.rbegin(); it != m_scopes.rend(); ++it) {
        auto f = it->vars.find(name);
        if (f != it->vars.end()) return f->second;
    }
    return global(name);
}

static const std::map<std::string, TypeDesc>& shaderGlobals() {
    static const std::map<std::string, TypeDesc> globals = {
        {"P", TypeDesc::TypePoint},     {"I", TypeDesc::TypeVector},
        {"N", TypeDesc::TypeNormal},    {"Ng", TypeDesc::TypeNormal},
        {"u", TypeDesc::TypeFloat},     {"v", TypeDesc::TypeFloat},
        {"dPdu", TypeDesc::TypeVector}, {"dPdv", TypeDesc::TypeVector},
        {"Ps", TypeDesc::TypePoint},    {"time", TypeDesc::TypeFloat},
        {"dtime", TypeDesc::TypeFloat}, {"dPdtime", TypeDesc::TypeVector},
        {"Ci", TypeDesc::TypeColor}};
    return globals;
}

bool CodeGen::isGlobalName(const std::string& name) const {
    return shaderGlobals().count(name) != 0;
}

Symbol* CodeGen::global(const std::string& name) {
    const auto& globals = shaderGlobals();
    auto it = globals.find(name);
    if (it == globals.end()) return nullptr;
    auto g = m_globals.find(name);
    if (g != m_globals.end()) return g->second;
    bool saved = m_checkOnly;
    m_checkOnly = false;
    Symbol* s = newSymbol(name, name == "Ci" ? TypeSpec(it->second, true) : TypeSpec(it->second),
                          SymTypeGlobal);
    m_checkOnly = saved;
    m_globals[name] = s;
    return s;
}

int CodeGen::emit(const std::string& name, std::vector<Symbol*> args, std::string rw) {
    Op op;
    op.name = name;
    if (rw.empty()) {
        rw.assign(args.size(), 'r');
        if (!args.empty()) rw[0] = 'w';
    }
    op.rw = rw;
    for (Symbol*& a : args)
        while (a && a->aliasOf) a = a->aliasOf;
    op.args = std::move(args);
    op.file = m_curFile;
    op.line = m_curLine;
    m_ops->push_back(std::move(op));
    return int(m_ops->size()) - 1;
}

// ---------------------------------------------------------------- declarations

void CodeGen::declareStruct(const Node* n) {
    bool taken = m_structs.count(n->name) != 0;
    if (taken || isGlobalName(n->name) || m_functions.count(n->name)) {
        error(n, alreadyDeclared(n->name));
        if (taken) return;
    }
    auto* spec = new StructSpec(ustring(n->name), 0);
    std::set<std::string> seen;
    for (const auto& decl : n->kids) {
        for (const auto& d : decl->kids) {
            TypeName tn = d->typeName;
            TypeSpec ft = resolveType(tn, d.get());
            if (!d->kids.empty() && d->kids[0]->kind == NodeKind::IntLit)
                ft.make_array(int(d->kids[0]->intValue));
            if (seen.count(d->name)) {
                error(d.get(),
                      "Field \"" + d->name + "\" already exists in struct \"" + n->name + "\"");
                continue;
            }
            seen.insert(d->name);
            spec->add_field(ft, ustring(d->name));
        }
    }
    int id = TypeSpec::new_struct(spec);
    if (!id) {
        error(n, "too many struct types");
        return;
    }
    m_structs[n->name] = id;
}

void CodeGen::declareFunction(const Node* n) {
    auto fn = std::make_unique<FunctionSymbol>();
    fn->name = n->name;
    fn->ret = resolveType(n->typeName, n);
    fn->decl = n;
    fn->file = fileOf(n);
    fn->line = n->line;
    fn->builtin = !n->body;
    // A closure declared without a body is a renderer closure: it takes keyword arguments too.
    if (fn->builtin && fn->ret.is_closure()) fn->isClosure = fn->variadic = true;
    for (const auto& m : n->metadata) {
        const Node* v = m->kid(0);
        if (m->name == "op" && v && v->kind == NodeKind::StringLit) fn->opname = v->stringValue;
        if (m->name == "builtin_closure") fn->isClosure = true;
    }
    for (const auto& p : n->kids) {
        if (p->typeName.name == "...") {
            fn->variadic = true;
            continue;
        }
        if (p->kid(0) && fn->file != "stdosl.h")
            error(p.get(),
                  "function parameter '" + p->name + "' may not have a default initializer.");
        FunctionSymbol::Param fp;
        fp.type = resolveType(p->typeName, p.get());
        fp.name = p->name;
        fp.output = p->typeName.isOutput;
        fn->params.push_back(fp);
    }
    if (fn->file != "stdosl.h" && n->name.rfind("___", 0) == 0) error(n, underscores(n->name));
    if (isGlobalName(n->name))
        error(n,
              alreadyDeclared(n->name) + " as a " + TypeSpec(shaderGlobals().at(n->name)).string());
    if (n->body && fn->file != "stdosl.h") warnIfRedefined(*fn, n);
    m_functions[n->name].push_back(std::move(fn));
}

// A second body for the same return and parameter types is allowed (the later one is used) but
// is worth a warning, as oslc gives; prototypes without a body do not count.
void CodeGen::warnIfRedefined(const FunctionSymbol& fn, const Node* at) {
    auto it = m_functions.find(fn.name);
    if (it == m_functions.end()) return;
    std::string places;
    for (auto r = it->second.rbegin(); r != it->second.rend(); ++r) {
        const FunctionSymbol& other = **r;
        bool sameTypes = other.ret == fn.ret && other.params.size() == fn.params.size();
        for (size_t i = 0; sameTypes && i < fn.params.size(); ++i)
            sameTypes = other.params[i].type == fn.params[i].type;
        bool defined = (other.decl && other.decl->body) || other.file == "stdosl.h";
        if (!sameTypes || !defined) continue;
        places += "\n    ";
        places += std::filesystem::path(other.file).filename().string();
        places += ':';
        places += std::to_string(other.line);
    }
    if (places.empty()) return;
    std::string msg = "Function '";
    msg += fn.signature();
    msg += "' redefined in the same scope\n  Previous definitions:";
    warning(at, msg + places);
}

void CodeGen::checkFunctionBody(FunctionSymbol* fn) {
    const Node* n = fn->decl;
    std::vector<Op> scratch;
    auto* savedOps = m_ops;
    bool savedCheck = m_checkOnly;
    FunctionSymbol* savedFn = m_currentFunction;
    bool savedReturn = m_sawReturn;
    int savedFile = m_curFile, savedLine = m_curLine;
    m_ops = &scratch;
    m_checkOnly = true;
    std::vector<const Node*> paramNodes;
    for (const auto& p : n->kids)
        if (p->typeName.name != "...") paramNodes.push_back(p.get());
    pushScope();
    for (size_t i = 0; i < fn->params.size(); ++i) {
        Symbol* p = newStructSymbol(fn->params[i].name, fn->params[i].type, SymTypeParam);
        if (fn->params[i].output) p->symtype = SymTypeOutputParam;
        declare(fn->params[i].name, p, i < paramNodes.size() ? paramNodes[i] : n);
    }
    m_currentFunction = fn;
    m_sawReturn = false;
    InlineFrame frame{fn, fn->ret.is_void() ? nullptr : temp(fn->ret), {}, {}};
    m_inline.push_back(frame);
    pushScope();
    for (const auto& s : n->body->kids) statement(s.get());
    popScope();
    m_inline.pop_back();
    m_currentFunction = savedFn;
    m_sawReturn = savedReturn;
    popScope();
    m_checkOnly = savedCheck;
    m_ops = savedOps;
    m_curFile = savedFile;
    m_curLine = savedLine;
}

bool CodeGen::run(const std::vector<NodePtr>& decls, ShaderUnit& out) {
    const Node* shader = nullptr;
    m_scopes.emplace_back(); // global scope
    for (const auto& d : decls) {
        switch (d->kind) {
        case NodeKind::StructDecl:
            declareStruct(d.get());
            break;
        case NodeKind::FunctionDecl: {
            declareFunction(d.get());
            FunctionSymbol* fn = m_functions[d->name].back().get();
            if (!fn->builtin && fileOf(d.get()) != "stdosl.h") checkFunctionBody(fn);
            break;
        }
        case NodeKind::ShaderDecl:
            if (shader) {
                error(d.get(), "Only one shader is allowed per file.");
                break;
            }
            shader = d.get();
            break;
        default:
            break;
        }
    }
    if (!shader) {
        if (!m_diag.errorCount())
            m_diag.error(m_files.empty() ? "" : m_files.back(), 1, "No shader function defined");
        return false;
    }
    compileShader(shader, out);
    return m_diag.errorCount() == 0;
}

bool CodeGen::constValue(const Node* e, const TypeSpec& t, std::vector<int>& iv,
                         std::vector<float>& fv, std::vector<std::string>& sv) {
    // Folds the literal forms a default may take: numbers, negated numbers, strings,
    // constructors and init lists of those.
    auto scalar = [&](const Node* n, double& out) -> bool {
        bool neg = false;
        while (n->kind == NodeKind::Unary && (n->op == "-" || n->op == "+")) {
            if (n->op == "-") neg = !neg;
            n = n->kid(0);
        }
        if (n->kind == NodeKind::IntLit)
            out = double(n->intValue);
        else if (n->kind == NodeKind::FloatLit)
            out = n->floatValue;
        else
            return false;
        if (neg) out = -out;
        return true;
    };
    TypeSpec elem = t.elementtype();
    if (t.is_array()) {
        if (e->kind != NodeKind::InitList) {
            // A single value fills one element (as for an unsized array).
            return constValue(e, elem, iv, fv, sv);
        }
        for (const auto& k : e->kids)
            if (!constValue(k.get(), elem, iv, fv, sv)) return false;
        return true;
    }
    if (t.is_string()) {
        if (e->kind != NodeKind::StringLit) return false;
        sv.push_back(e->stringValue);
        return true;
    }
    if (t.is_int()) {
        double d;
        if (!scalar(e, d) || e->kind == NodeKind::FloatLit) return false;
        iv.push_back(int(d));
        return true;
    }
    if (t.is_float()) {
        double d;
        if (!scalar(e, d)) return false;
        fv.push_back(float(d));
        return true;
    }
    if (t.is_triple() || t.is_matrix()) {
        int n = t.is_matrix() ? 16 : 3;
        double d;
        if (scalar(e, d)) {
            for (int i = 0; i < n; ++i)
                fv.push_back(t.is_matrix() ? ((i % 5 == 0) ? float(d) : 0.0f) : float(d));
            return true;
        }
        if (e->kind == NodeKind::TypeCtor && !e->isCast && !e->typeName.closure) {
            std::vector<double> vals;
            for (const auto& k : e->kids) {
                if (!scalar(k.get(), d)) return false;
                vals.push_back(d);
            }
            if (vals.size() == 1) {
                for (int i = 0; i < n; ++i)
                    fv.push_back(t.is_matrix() ? ((i % 5 == 0) ? float(vals[0]) : 0.0f)
                                               : float(vals[0]));
                return true;
            }
            if (int(vals.size()) != n) return false;
            for (double x : vals) fv.push_back(float(x));
            return true;
        }
        if (e->kind == NodeKind::InitList && int(e->kids.size()) == n) {
            for (const auto& k : e->kids) {
                if (!scalar(k.get(), d)) return false;
                fv.push_back(float(d));
            }
            return true;
        }
    }
    return false;
}

std::string formatFloat(float f) {
    char buf[32];
    std::snprintf(buf, sizeof buf, "%.9g", f);
    return buf;
}

std::string quoteString(const std::string& s) {
    std::string q = "\"";
    for (char c : s) {
        switch (c) {
        case '\n':
            q += "\\n";
            break;
        case '\t':
            q += "\\t";
            break;
        case '\r':
            q += "\\r";
            break;
        case '"':
            q += "\\\"";
            break;
        case '\\':
            q += "\\\\";
            break;
        default:
            q += c;
        }
    }
    return q + "\"";
}

std::string CodeGen::metaHint(const Node* m) {
    TypeSpec t = resolveType(m->typeName, m);
    std::vector<int> iv;
    std::vector<float> fv;
    std::vector<std::string> sv;
    const Node* init = m->kid(0);
    if (!init || !constValue(init, t, iv, fv, sv)) {
        error(m, "metadata '" + m->name + "' must be a constant of type " + t.string());
        return "";
    }
    if (t.is_unsized_array()) t.make_array(int(iv.size() + sv.size() + fv.size()));
    std::string h = "%meta{" + t.string() + "," + m->name;
    // Appended piecewise: `"," + temporary` trips a false overlap warning in GCC 12's string.
    for (int i : iv) h.append(",").append(std::to_string(i));
    for (float f : fv) h.append(",").append(formatFloat(f));
    for (const auto& s : sv) h.append(",").append(quoteString(s));
    return h + "}";
}

void CodeGen::shaderParam(const Node* p, ShaderUnit&) {
    TypeSpec t = resolveType(p->typeName, p);
    SymType st = p->typeName.isOutput ? SymTypeOutputParam : SymTypeParam;
    const Node* init = p->kid(0);
    bool unsized = t.is_unsized_array();
    if (unsized && init && init->kind == NodeKind::InitList && !init->kids.empty() &&
        !t.is_structure_based()) {
        // The default's length sizes the array inside the shader; the OSO still says T[].
        t.make_array(int(init->kids.size()));
    }
    // The OSO has no form for an array of structs as a parameter.
    if (t.is_structure_based() && t.is_array() && init && init->kind == NodeKind::InitList)
        error(p, "array of struct are not allowed as parameters");
    Symbol* s = newStructSymbol(p->name, t, st);
    s->unsizedParam = unsized;
    for (const auto& m : p->metadata) s->metaHints.push_back(metaHint(m.get()));
    declare(p->name, s, p);
    auto fillZero = [&](Symbol* sym) {
        int n = sym->type.numelements();
        if (sym->type.is_unsized_array()) n = 0;
        TypeSpec e = sym->type.elementtype();
        if (e.is_int())
            sym->ivals.assign(n, 0);
        else if (e.is_string())
            sym->svals.assign(n, "");
        else if (e.is_triple())
            sym->fvals.assign(3 * n, 0.f);
        else if (e.is_matrix())
            sym->fvals.assign(16 * n, 0.f);
        else if (e.is_float())
            sym->fvals.assign(n, 0.f);
    };
    std::vector<Symbol*> leaves;
    std::function<void(Symbol*)> collect = [&](Symbol* x) {
        if (x->fields.empty()) leaves.push_back(x);
        for (auto* f : x->fields) collect(f);
    };
    collect(s);
    if (!init) {
        for (auto* l : leaves) fillZero(l);
        return;
    }
    if (init->kind == NodeKind::InitList && init->kids.empty()) {
        if (!t.is_unsized_array()) fillZero(s);
        return;
    }
    // A closure parameter starts empty: `= 0` says just that and needs no code.
    if (t.is_closure() && !t.is_array() && init->kind == NodeKind::IntLit && init->intValue == 0)
        return;
    if (t.is_structure() && init->kind == NodeKind::InitList &&
        init->kids.size() <= s->fields.size()) {
        // A struct default made of constants (nested structs included) gives each field its
        // own default.
        std::function<bool(Symbol*, const Node*)> constFields = [&](Symbol* st, const Node* list) {
            for (size_t i = 0; i < st->fields.size(); ++i) {
                Symbol* f = st->fields[i];
                if (i >= list->kids.size()) {
                    for (auto* l : leaves)
                        if (l == f || l->name.rfind(f->name + ".", 0) == 0) fillZero(l);
                    continue;
                }
                const Node* k = list->kid(i);
                if (f->type.is_closure() && k->kind == NodeKind::IntLit && k->intValue == 0)
                    continue; // an empty closure: no value to write
                if (f->type.is_structure() && k->kind == NodeKind::InitList &&
                    k->kids.size() <= f->fields.size()) {
                    if (!constFields(f, k)) return false;
                    continue;
                }
                // Array fields are computed by code even from constants, as oslc does.
                if (f->type.is_structure_based() || f->type.is_closure_based() ||
                    f->type.is_array() || !constValue(k, f->type, f->ivals, f->fvals, f->svals))
                    return false;
            }
            return true;
        };
        const bool allConst = constFields(s, init);
        if (allConst) return;
        for (auto* l : leaves) l->ivals.clear(), l->fvals.clear(), l->svals.clear();
        for (Symbol* f : s->fields) f->ivals.clear(), f->fvals.clear(), f->svals.clear();
        // Pair each leaf field with its part of the list, through nested lists; a nested
        // struct given by anything other than a list leaves the whole default to code.
        std::vector<std::pair<Symbol*, const Node*>> parts;
        std::function<bool(Symbol*, const Node*)> split = [&](Symbol* st, const Node* list) {
            for (size_t i = 0; i < st->fields.size(); ++i) {
                Symbol* f = st->fields[i];
                const Node* k = i < list->kids.size() ? list->kid(i) : nullptr;
                if (f->type.is_closure_based()) return false;
                if (f->fields.empty()) {
                    parts.emplace_back(f, k);
                    continue;
                }
                if (!k || k->kind != NodeKind::InitList || k->kids.size() > f->fields.size())
                    return false;
                if (!split(f, k)) return false;
            }
            return true;
        };
        if (split(s, init)) {
            // Constant fields keep their defaults; each other field is computed by a code
            // section of its own and starts from whatever components are constant.
            std::vector<std::pair<Symbol*, const Node*>> computed;
            for (auto& [f, k] : parts) {
                if (!k) {
                    fillZero(f);
                    continue;
                }
                if (!f->type.is_array() && constValue(k, f->type, f->ivals, f->fvals, f->svals))
                    continue;
                f->ivals.clear(), f->fvals.clear(), f->svals.clear();
                fillZero(f);
                bool components =
                    (k->kind == NodeKind::TypeCtor && !k->isCast) || k->kind == NodeKind::InitList;
                if (f->type.is_triple() && components && k->kids.size() == 3) {
                    for (int c = 0; c < 3; ++c) {
                        std::vector<int> civ;
                        std::vector<float> cfv;
                        std::vector<std::string> csv;
                        if (constValue(k->kid(c), TypeSpec(TypeDesc::TypeFloat), civ, cfv, csv))
                            f->fvals[c] = cfv[0];
                    }
                }
                f->initexpr = true;
                computed.emplace_back(f, k);
            }
            m_curFile = p->file;
            m_curLine = p->line;
            for (auto& [f, k] : computed) {
                f->initBegin = nextOp();
                TypeSpec ft = f->type;
                if (ft.is_array() && k->kind == NodeKind::InitList) {
                    initVariable(f, k, k, true); // element by element, or one constant
                    f->initEnd = nextOp();
                    continue;
                }
                Symbol* val = k->kind == NodeKind::InitList ? initList(k, ft) : expr(k, &ft);
                if (!assignCompatible(ft, val->type)) {
                    error(k, "Can't assign '" + val->type.string() + "' to '" + ft.string() + " " +
                                 f->name + "'");
                    continue;
                }
                assignInto(f, val, k);
                f->initEnd = nextOp();
            }
            return;
        }
        for (auto* l : leaves) l->ivals.clear(), l->fvals.clear(), l->svals.clear();
    }
    if (!t.is_structure_based() && !t.is_closure_based()) {
        std::vector<int> iv;
        std::vector<float> fv;
        std::vector<std::string> sv;
        if (constValue(init, t, iv, fv, sv)) {
            s->ivals = iv;
            s->fvals = fv;
            s->svals = sv;
            if (t.is_unsized_array()) {
                int n = int(iv.size() + sv.size() +
                            fv.size() / (t.elementtype().is_triple()   ? 3
                                         : t.elementtype().is_matrix() ? 16
                                                                       : 1));
                s->type.make_array(std::max(1, n));
            } else if (t.is_array()) {
                // Pad a short list with zeros so every element has a default.
                TypeSpec e = t.elementtype();
                int per = e.is_triple() ? 3 : e.is_matrix() ? 16 : 1;
                if (e.is_int())
                    s->ivals.resize(t.arraylength(), 0);
                else if (e.is_string())
                    s->svals.resize(t.arraylength());
                else
                    s->fvals.resize(size_t(t.arraylength()) * per, 0.f);
            }
            return;
        }
    }
    // A default computed by code: its ops form a section named after the parameter.
    for (auto* l : leaves) {
        fillZero(l);
        l->initexpr = true;
    }
    s->initBegin = nextOp();
    m_curFile = p->file;
    m_curLine = p->line;
    initVariable(s, init, p, true);
    int end = nextOp();
    for (auto* l : leaves) {
        l->initBegin = s->initBegin;
        l->initEnd = end;
    }
    s->initEnd = end;
}

void CodeGen::compileShader(const Node* n, ShaderUnit& out) {
    out.shaderType = n->op;
    out.shaderName = n->name;
    for (const auto& m : n->metadata) out.metaHints.push_back(metaHint(m.get()));
    pushScope();
    m_shaderScopeDepth = int(m_scopes.size()) - 1;
    for (const auto& p : n->kids) {
        if (!p->kid(0))
            error(p.get(), "shader parameter '" + p->name + "' requires a default initializer");
        shaderParam(p.get(), out);
    }
    out.mainBegin = nextOp();
    for (const auto& s : n->body->kids) statement(s.get());
    emit("end", {});
    popScope();
    out.ops = std::move(m_mainOps);
    out.files = m_files;
    // Parameters first (in declaration order), then globals, then everything else.
    std::vector<Symbol*> params, globals, rest;
    for (Symbol* s : m_symbols) {
        if (s->symtype == SymTypeParam || s->symtype == SymTypeOutputParam)
            params.push_back(s);
        else if (s->symtype == SymTypeGlobal)
            globals.push_back(s);
        else
            rest.push_back(s);
    }
    out.symbols = params;
    out.symbols.insert(out.symbols.end(), globals.begin(), globals.end());
    out.symbols.insert(out.symbols.end(), rest.begin(), rest.end());
}

} // namespace OSL::pvt
