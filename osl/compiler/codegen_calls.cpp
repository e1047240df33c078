// Calls: overload resolution of user and built-in functions, the ops a built-in becomes (with
// format checks and derivative hints), user-defined operators, and inlining of user functions.
#include "codegen.h"
#include "codegen_internal.h"
#include "format_check.h"

#include <algorithm>
#include <functional>

namespace OSL::pvt {

static int conversionCost(const TypeSpec& arg, const TypeSpec& param, bool output) {
    if (arg == param) return 0;
    if (param.is_unsized_array() && arg.is_array()) {
        TypeSpec a = arg.elementtype(), p = param.elementtype();
        return (a == p || equivalent(a, p)) ? 0 : -1;
    }
    if (arg.is_array() || param.is_array()) return equivalent(arg, param) ? 0 : -1;
    // A struct of another name but the same layout is accepted, after the struct itself.
    if (arg.is_structure_based() || param.is_structure_based())
        return equivalent(arg, param) ? 1 : -1;
    if (arg.is_closure_based() || param.is_closure_based())
        return (arg.is_closure_based() && param.is_closure_based()) ? 0 : -1;
    if (arg.is_triple() && param.is_triple()) return output ? -1 : 1;
    if (output) return -1;
    if (arg.is_int() && param.is_float()) return 2;
    if (arg.is_float() && param.is_triple()) return 3;
    if (arg.is_int() && param.is_triple()) return 4;
    return -1;
}

static int returnRank(const TypeSpec& t) {
    if (t.is_float()) return 0;
    if (t.is_int()) return 1;
    if (t.is_color()) return 2;
    if (t.is_vector()) return 3;
    if (t.is_point()) return 4;
    if (t.is_normal()) return 5;
    if (t.is_matrix()) return 6;
    if (t.is_string()) return 7;
    if (t.is_void()) return 9;
    return 8;
}

FunctionSymbol* CodeGen::resolveOverload(const std::string& name,
                                         const std::vector<TypeSpec>& argTypes, const Node* at,
                                         const TypeSpec* expected, bool report) {
    auto it = m_functions.find(name);
    std::string argSig;
    for (size_t i = 0; i < argTypes.size(); ++i) argSig += (i ? ", " : "") + argTypes[i].string();
    if (it == m_functions.end()) {
        if (report) error(at, "function '" + name + "' was not declared in this scope");
        return nullptr;
    }
    auto& cands = it->second;
    std::vector<std::pair<int, FunctionSymbol*>> scored;
    for (auto& fp : cands) {
        FunctionSymbol* f = fp.get();
        if (argTypes.size() < f->params.size() ||
            (!f->variadic && argTypes.size() > f->params.size()))
            continue;
        int total = 0;
        for (size_t i = 0; i < f->params.size() && total >= 0; ++i) {
            int c = conversionCost(argTypes[i], f->params[i].type, f->params[i].output);
            total = c < 0 ? -1 : total + c;
        }
        if (total >= 0) scored.push_back({total, f});
    }
    auto location = [](FunctionSymbol* f) {
        return "    " + f->file + ":" + std::to_string(f->line) + "\t" + f->signature() + "\n";
    };
    if (scored.empty()) {
        if (report) {
            std::string msg =
                "No matching function call to '" + name + " (" + argSig + ")'\n  Candidates are:\n";
            for (auto r = cands.rbegin(); r != cands.rend(); ++r) msg += location(r->get());
            msg.pop_back();
            error(at, msg);
        }
        return nullptr;
    }
    int best = INT_MAX;
    for (auto& s : scored) best = std::min(best, s.first);
    std::vector<FunctionSymbol*> ties;
    for (auto& s : scored)
        if (s.first == best) ties.push_back(s.second);
    if (ties.size() == 1) return ties[0];
    bool sameParams = true;
    for (auto* f : ties) {
        for (size_t i = 0; i < f->params.size() && i < ties[0]->params.size(); ++i)
            if (!(f->params[i].type == ties[0]->params[i].type)) sameParams = false;
        if (f->params.size() != ties[0]->params.size()) sameParams = false;
    }
    if (sameParams) {
        // A user function replaces the library's one with the same parameters.
        for (auto r = cands.rbegin(); r != cands.rend(); ++r)
            if (std::find(ties.begin(), ties.end(), r->get()) != ties.end() &&
                (*r)->file != "stdosl.h" &&
                std::all_of(ties.begin(), ties.end(), [&](FunctionSymbol* f) {
                    return f->ret == (*r)->ret || f->file == "stdosl.h";
                }))
                return r->get();
    }
    if (expected)
        for (auto* f : ties)
            if (f->ret == *expected) return f;
    // Later declarations win over earlier ones with the same parameters (user overrides).
    std::stable_sort(ties.begin(), ties.end(), [](FunctionSymbol* a, FunctionSymbol* b) {
        return returnRank(a->ret) < returnRank(b->ret);
    });
    bool allStruct = std::all_of(ties.begin(), ties.end(),
                                 [](FunctionSymbol* f) { return f->ret.is_structure_based(); });
    bool user = std::any_of(ties.begin(), ties.end(),
                            [](FunctionSymbol* f) { return f->file != "stdosl.h"; });
    if (report && user) {
        if (allStruct) {
            std::string msg =
                "Ambiguous call to '" + name + " (" + argSig + ")'\n  Candidates are:\n";
            for (auto r = cands.rbegin(); r != cands.rend(); ++r)
                if (std::find(ties.begin(), ties.end(), r->get()) != ties.end())
                    msg += location(r->get());
            msg.pop_back();
            error(at, msg);
            return ties[0];
        }
        std::string msg = "Ambiguous call to '" + name + " (" + argSig +
                          ")'\n  Chosen function is:\n" + location(ties[0]) +
                          "  Other candidates are:\n";
        // In the order of preference by return type, as oslc lists them.
        for (size_t i = 1; i < ties.size(); ++i) msg += location(ties[i]);
        msg.pop_back();
        warning(at, msg);
    }
    return ties[0];
}

Symbol* CodeGen::call(const Node* e, const TypeSpec* expected, Symbol* dest) {
    auto st = m_structs.find(e->name);
    if (st != m_structs.end()) return structCtor(e, st->second);
    bool shadowed = false;
    for (auto it = m_scopes.rbegin(); it != m_scopes.rend(); ++it)
        if (it->vars.count(e->name)) shadowed = true;
    std::vector<Symbol*> args;
    std::vector<LRef> refs;
    std::vector<TypeSpec> types;
    // Casting one triple to another changes no bits: the function gets the value itself, and
    // the cast's type chooses the overload (ops that treat points, vectors and normals
    // differently say so in their names).
    for (const auto& k : e->kids) {
        const Node* a = k.get();
        LRef r;
        if (a->kind == NodeKind::TypeCtor && a->isCast && a->kids.size() == 1 && !m_checkOnly) {
            TypeSpec t = resolveType(a->typeName, a);
            if (t.is_triple()) {
                Symbol* v = expr(a->kid(0), &t); // the cast steers an overloaded call
                const bool same = v->type.is_triple() && !v->type.is_array();
                args.push_back(same ? v : construct(a, t, {v}));
                refs.push_back(r);
                types.push_back(t);
                continue;
            }
        }
        if (a->kind == NodeKind::VarRef || a->kind == NodeKind::Index ||
            a->kind == NodeKind::Field) {
            r = lvalue(a, false);
            args.push_back(load(r, a));
            const_cast<Node*>(a)->type = args.back()->type;
        } else {
            const TypeSpec* hint = nullptr;
            if (a->kind == NodeKind::InitList) {
                // `{...}` takes its type from the parameter it is passed to.
                size_t idx = refs.size();
                auto fit = m_functions.find(e->name);
                if (fit != m_functions.end())
                    for (auto& cand : fit->second)
                        if (cand->params.size() == e->kids.size() && idx < cand->params.size()) {
                            hint = &cand->params[idx].type;
                            break;
                        }
            }
            args.push_back(expr(a, hint));
        }
        refs.push_back(r);
        types.push_back(args.back()->type);
    }
    m_curLine = e->line;
    m_curFile = e->file;
    if (shadowed) {
        error(e, "'" + e->name + "' is not a function");
        std::string argSig;
        for (size_t i = 0; i < types.size(); ++i) argSig += (i ? ", " : "") + types[i].string();
        error(e, "No matching function call to '" + e->name + " (" + argSig + ")'");
        return temp(kFloat);
    }
    FunctionSymbol* fn = resolveOverload(e->name, types, e, expected);
    if (!fn) return temp(expected && !expected->is_void() ? *expected : kFloat);
    const_cast<Node*>(e)->func = fn;
    // Output arguments must be writable.
    for (size_t i = 0; i < fn->params.size() && i < args.size(); ++i) {
        if (!fn->params[i].output) continue;
        if (!refs[i].valid()) {
            error(e, "Cannot pass an expression as output argument " + std::to_string(i + 1) +
                         " of " + fn->name + "()");
            continue;
        }
        checkWritable(refs[i].sym, e,
                      ", as passed to function " + fn->name + "() as arg " + std::to_string(i + 1) +
                          " (output parameter \"" + fn->params[i].name + "\")");
    }
    bool formatChecked = fn->builtin && isFormatFunction(fn->name) && fn->file == "stdosl.h" &&
                         checkFormatCall(fn, e, types);
    if (fn->builtin) return builtinCall(fn, e, args, refs, expected, formatChecked);
    // The result goes straight into `dest` unless an argument reads it, or an output argument
    // is one of its components (stored back after the call).
    if (dest && !canTarget(dest, fn->ret)) dest = nullptr;
    for (const LRef& r : refs)
        if (dest && r.sym == dest) dest = nullptr;
    for (Symbol* a : args)
        if (dest && rootOf(a) == rootOf(dest)) dest = nullptr;
    return inlineCall(fn, e, args, refs, dest);
}

// Checks the values of a printf-like call against its format string, when that is a literal.
// True when the format was checked (its messages then cover struct values too).
bool CodeGen::checkFormatCall(FunctionSymbol* fn, const Node* e,
                              const std::vector<TypeSpec>& types) {
    size_t formatIndex = fn->name == "fprintf" ? 1 : 0;
    const Node* format = formatIndex < e->kids.size() ? e->kids[formatIndex].get() : nullptr;
    if (!format || format->kind != NodeKind::StringLit) {
        warning(e, fn->name + "() uses a format string that is not a constant.");
        return false;
    }
    std::vector<TypeSpec> values(types.begin() + formatIndex + 1, types.end());
    std::string msg =
        checkFormatArguments(fn->name, format->stringValue, values, int(formatIndex) + 2);
    if (!msg.empty()) error(e, msg);
    return true;
}

// The arguments (counted from the result, 0) whose derivatives an op reads, written to the OSO as
// %argderivs so that the renderer keeps derivatives for them: the value being differentiated,
// texture coordinates when no explicit derivatives follow them, and the position (and period)
// arguments of a named noise.
static std::vector<int> derivativeArgs(const std::string& op, const std::vector<Symbol*>& a) {
    const auto isString = [&](size_t i) { return i < a.size() && a[i] && a[i]->type.is_string(); };
    if (op == "Dx" || op == "Dy" || op == "Dz" || op == "area" || op == "filterwidth" ||
        op == "calculatenormal")
        return {1};
    if (op == "texture" && (a.size() == 4 || isString(4))) return {2, 3};
    if ((op == "texture3d" || op == "environment") && (a.size() == 3 || isString(3))) return {2};
    if (op == "trace") return {1, 2};
    if ((op == "noise" || op == "pnoise") && isString(1)) {
        std::vector<int> r;
        for (size_t i = 2; i < a.size() && !isString(i); ++i) r.push_back(int(i));
        return r;
    }
    return {};
}

Symbol* CodeGen::builtinCall(FunctionSymbol* fn, const Node* e, std::vector<Symbol*>& args,
                             std::vector<LRef>& refs, const TypeSpec*, bool formatChecked) {
    std::vector<Symbol*> opargs;
    std::string rw;
    Symbol* result = nullptr;
    if (!fn->ret.is_void()) {
        result = temp(fn->ret);
        opargs.push_back(result);
        rw += 'w';
    }
    if (fn->isClosure) {
        opargs.push_back(constString(fn->name));
        rw += 'r';
    }
    std::vector<std::pair<size_t, Symbol*>> writeBacks;
    bool nextIsOutput = false;
    for (size_t i = 0; i < args.size(); ++i) {
        Symbol* a = args[i];
        bool out = i < fn->params.size() && fn->params[i].output;
        if (i >= fn->params.size()) {
            if (a->type.is_structure_based()) {
                if (!formatChecked)
                    error(e, "struct '" + a->type.structspec()->name().string() +
                                 "' is not a valid argument");
                continue;
            }
            // Optional texture/attribute arguments named "alpha" etc. are written by the op.
            out = nextIsOutput;
            nextIsOutput = false;
            if (a->isConst() && a->type.is_string() && !a->svals.empty()) {
                const std::string& s = a->svals[0];
                nextIsOutput =
                    (s == "alpha" || s == "errormessage") &&
                    (fn->name == "texture" || fn->name == "texture3d" || fn->name == "environment");
            }
        } else if (!out) {
            a = convert(a, fn->params[i].type, e);
        }
        if (out && (refs[i].index || refs[i].comp)) {
            Symbol* t = temp(a->type);
            writeBacks.push_back({i, t});
            a = t;
        }
        opargs.push_back(a);
        rw += out ? 'w' : 'r';
    }
    m_curLine = e->line;
    const std::string opname = fn->isClosure        ? std::string("closure")
                               : fn->opname.empty() ? fn->name
                                                    : fn->opname;
    int op = emit(opname, opargs, rw);
    (*m_ops)[op].argDerivs = derivativeArgs(opname, opargs);
    for (auto& wb : writeBacks) store(refs[wb.first], wb.second, e);
    return result ? result : voidValue();
}

Symbol* CodeGen::voidValue() {
    if (!m_void) {
        m_pool.push_back(std::make_unique<Symbol>());
        m_void = m_pool.back().get();
        m_void->type = TypeSpec(TypeDesc(TypeDesc::NONE));
        m_void->name = "$void";
    }
    return m_void;
}

Symbol* CodeGen::operatorCall(const std::string& opname, const std::vector<Symbol*>& args,
                              const Node* at, Symbol* dest) {
    if (!m_functions.count(opname)) return nullptr;
    std::vector<TypeSpec> types;
    for (Symbol* a : args) types.push_back(a->type);
    FunctionSymbol* fn = resolveOverload(opname, types, at, nullptr, false);
    if (!fn) return nullptr;
    std::vector<Symbol*> callArgs = args;
    std::vector<LRef> refs(args.size());
    if (fn->builtin) return builtinCall(fn, at, callArgs, refs, nullptr);
    return inlineCall(fn, at, callArgs, refs, canTarget(dest, fn->ret) ? dest : nullptr);
}

Symbol* CodeGen::inlineCall(FunctionSymbol* fn, const Node* e, std::vector<Symbol*>& args,
                            std::vector<LRef>& refs, Symbol* dest) {
    for (const auto& f : m_inline)
        if (f.fn == fn) {
            error(e, "Recursive call to function '" + fn->name + "' is not allowed");
            return temp(fn->ret.is_void() ? kFloat : fn->ret);
        }
    if (m_inline.size() > 64) {
        error(e, "function calls nested too deeply");
        return temp(kFloat);
    }
    if (m_checkOnly && m_currentFunction) {
        // While checking a function on its own, a call only needs its types.
        Symbol* r = fn->ret.is_void() ? voidValue() : temp(fn->ret);
        return r;
    }
    const Node* decl = fn->decl;
    int callop = emit("functioncall", {constString(fn->name)}, "r");
    Symbol* result = fn->ret.is_void() ? nullptr : dest ? dest : temp(fn->ret);
    std::vector<std::pair<size_t, Symbol*>> writeBacks;
    auto savedScopes = std::move(m_scopes);
    int savedShaderDepth = m_shaderScopeDepth;
    m_shaderScopeDepth = -1;
    m_scopes.clear();
    m_scopes.push_back(savedScopes.front()); // global scope only
    pushScope();
    for (size_t i = 0; i < fn->params.size(); ++i) {
        const auto& p = fn->params[i];
        Symbol* a = args[i];
        if (p.output) {
            const TypeSpec& at = refs[i].valid() ? refs[i].sym->type : a->type;
            bool sameArray = p.type.is_unsized_array() && at.is_array() &&
                             equivalent(at.elementtype(), p.type.elementtype());
            if (refs[i].valid() && !refs[i].index && !refs[i].comp &&
                (equivalent(at, p.type) || sameArray)) {
                a = refs[i].sym;
            } else if (refs[i].valid() && a->symtype == SymTypeTemp &&
                       equivalent(a->type, p.type)) {
                // An array element or component was just loaded into a temporary of its own:
                // the function works on it and it is stored back afterwards.
                writeBacks.push_back({i, a});
            } else {
                Symbol* t = newStructSymbol(
                    scopedName(p.name), p.type.is_unsized_array() ? a->type : p.type, SymTypeLocal);
                assignInto(t, a, e);
                writeBacks.push_back({i, t});
                a = t;
            }
        } else if (!(a->type == p.type) && !(p.type.is_unsized_array() && a->type.is_array()) &&
                   !(equivalent(a->type, p.type) && !a->type.is_structure_based())) {
            a = convert(a, p.type, e);
        } else if (!p.output && a->type.is_triple() && !a->type.is_array() && p.type.is_triple() &&
                   !(a->type == p.type)) {
            a = viewAs(a, p.type);
        }
        m_scopes.back().vars[p.name] = a;
    }
    m_inline.push_back({fn, result, {}, {}});
    ++m_silent;
    FunctionSymbol* savedFn = m_currentFunction;
    m_currentFunction = nullptr;
    auto savedLoops = std::move(m_loops);
    m_loops.clear();
    bool savedSawReturn = m_sawReturn;
    m_sawReturn = false;
    pushScope();
    for (const auto& s : decl->body->kids) statement(s.get());
    popScope();
    bool returned = m_sawReturn;
    m_sawReturn = savedSawReturn;
    m_loops = std::move(savedLoops);
    m_currentFunction = savedFn;
    --m_silent;
    InlineFrame frame = m_inline.back();
    m_inline.pop_back();
    // A `return` as the last op needs no jump: drop it.
    if (!frame.returnOps.empty() && frame.returnOps.back() == nextOp() - 1 &&
        !frame.keptReturns.count(frame.returnOps.back())) {
        int last = nextOp() - 1;
        m_ops->pop_back();
        for (int i = callop; i < last; ++i)
            for (int& j : (*m_ops)[i].jumps)
                if (j > last) j = last;
    }
    (*m_ops)[callop].jumps = {nextOp()};
    // Reported where the function is used, as the reference compiler does.
    if (result && !returned)
        error(e, "non-void function \"" + fn->name + "\" had no 'return' statement.");
    m_scopes = std::move(savedScopes);
    m_shaderScopeDepth = savedShaderDepth;
    m_curLine = e->line;
    m_curFile = e->file;
    for (auto& wb : writeBacks) store(refs[wb.first], wb.second, e);
    return result ? result : voidValue();
}

} // namespace OSL::pvt
