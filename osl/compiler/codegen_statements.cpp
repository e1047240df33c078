// Statements: declarations of locals and their initialisation, conditions, loops and return.
#include "codegen.h"
#include "codegen_internal.h"

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <functional>

namespace OSL::pvt {

void CodeGen::statement(const Node* s) {
    if (!s) return;
    m_curFile = s->file;
    m_curLine = s->line;
    switch (s->kind) {
    case NodeKind::Block:
        pushScope();
        for (const auto& k : s->kids) statement(k.get());
        popScope();
        break;
    case NodeKind::ExprStmt:
        expr(s->kid(0));
        break;
    case NodeKind::VarDecl:
        varDecl(s);
        break;
    case NodeKind::If:
        ifStatement(s);
        break;
    case NodeKind::Loop:
        loop(s);
        break;
    case NodeKind::Break:
    case NodeKind::Continue:
        if (m_loops.empty()) {
            error(s, std::string("Cannot '") + (s->kind == NodeKind::Break ? "break" : "continue") +
                         "' here -- not inside a loop.");
            break;
        }
        emit(s->kind == NodeKind::Break ? "break" : "continue", {}, "");
        break;
    case NodeKind::Return:
        returnStatement(s);
        break;
    case NodeKind::StructDecl:
        if (!m_declaredFunctions.count(s)) {
            m_declaredFunctions.insert(s);
            declareStruct(s);
        }
        break;
    case NodeKind::FunctionDecl:
        // A function defined inside another body: declared (and checked) on first sight.
        if (!m_declaredFunctions.count(s)) {
            m_declaredFunctions.insert(s);
            declareFunction(s);
            FunctionSymbol* fn = m_functions[s->name].back().get();
            if (!fn->builtin) checkFunctionBody(fn);
        }
        break;
    default:
        break;
    }
}

void CodeGen::varDecl(const Node* d) {
    for (const auto& v : d->kids) {
        m_curLine = v->line;
        TypeSpec t = resolveType(v->typeName, v.get());
        const Node* lenExpr = v->kid(0);
        const Node* init = v->kid(1);
        if (lenExpr && lenExpr->kind == NodeKind::Empty) lenExpr = nullptr;
        if (lenExpr) {
            if (lenExpr->kind == NodeKind::IntLit) {
                if (lenExpr->intValue < 1) {
                    error(v.get(),
                          "Invalid array length (" + std::to_string(lenExpr->intValue) + ")");
                    error(v.get(), "Invalid array length for " + v->name);
                    continue;
                }
                if (t.is_structure_based())
                    t = TypeSpec(v->typeName.name.c_str(), t.structure(), int(lenExpr->intValue));
                else
                    t.make_array(int(lenExpr->intValue));
            } else {
                error(v.get(), "Array length must be a constant integer");
                continue;
            }
        }
        if (t.is_unsized_array()) {
            int n = init && init->kind == NodeKind::InitList ? int(init->kids.size()) : 0;
            if (n < 1) {
                error(v.get(), "Invalid array length for " + v->name);
                continue;
            }
            if (t.is_structure_based())
                t = TypeSpec(v->typeName.name.c_str(), t.structure(), n);
            else
                t.make_array(n);
        }
        if (t.is_void()) {
            error(v.get(), "variable '" + v->name + "' declared void");
            continue;
        }
        if (m_structs.count(v->name)) {
            error(v.get(), "type name '" + v->name + "' can't be used as a variable");
        }
        Symbol* s = newStructSymbol(scopedName(v->name), t, SymTypeLocal);
        // The name is visible only after its initialiser, which still sees an outer variable
        // of the same name: `string name = cond ? "x" : name;`.
        if (init) initVariable(s, init, v.get(), true);
        declare(v->name, s, v.get());
    }
}

// An array of numbers or strings initialised wholly from literals is one constant, copied in
// with a single op, as oslc makes it.
Symbol* CodeGen::constArray(const Node* init, const TypeSpec& t) {
    TypeSpec elem = t.elementtype();
    if (!t.is_sized_array() || int(init->kids.size()) != t.arraylength() ||
        !(elem.is_int() || elem.is_float() || elem.is_string()))
        return nullptr;
    auto literal = [](const Node* k) {
        if (k->kind == NodeKind::Unary && k->op == "-" && k->kid(0)) k = k->kid(0);
        return k->kind == NodeKind::IntLit || k->kind == NodeKind::FloatLit ||
               k->kind == NodeKind::StringLit;
    };
    for (const auto& k : init->kids)
        if (!literal(k.get()) || (elem.is_string() != (k->kind == NodeKind::StringLit)))
            return nullptr;
    std::vector<int> iv;
    std::vector<float> fv;
    std::vector<std::string> sv;
    for (const auto& k : init->kids) {
        Symbol* v = expr(k.get(), &elem);
        if (!v->isConst()) return nullptr;
        if (elem.is_string() && !v->svals.empty())
            sv.push_back(v->svals[0]);
        else if (elem.is_int() && v->type.is_int() && !v->ivals.empty())
            iv.push_back(v->ivals[0]);
        else if (elem.is_float() && v->type.is_int() && !v->ivals.empty())
            fv.push_back(float(v->ivals[0]));
        else if (elem.is_float() && v->type.is_float() && !v->fvals.empty())
            fv.push_back(v->fvals[0]);
        else
            return nullptr;
    }
    return constant(t, iv, fv, sv);
}

void CodeGen::initVariable(Symbol* var, const Node* init, const Node* at, bool isDecl) {
    const TypeSpec& t = var->type;
    if (init->kind == NodeKind::InitList) {
        if (init->kids.empty()) {
            error(at, "Empty compound initializers '{ }' only allowed for shader parameters.");
            return;
        }
        if (t.is_array()) {
            if (int(init->kids.size()) > t.arraylength()) {
                error(at, "Too many initializers for a '" + t.string() + "'");
                return;
            }
            TypeSpec elem = t.elementtype();
            if (Symbol* folded = constArray(init, t)) {
                emit("assign", {var, folded});
                return;
            }
            for (size_t i = 0; i < init->kids.size(); ++i) {
                const Node* k = init->kid(i);
                LRef r;
                r.sym = var;
                r.index = constInt(int(i));
                r.type = elem.is_structure_based()
                             ? TypeSpec(elem.structspec()->name().c_str(), elem.structure())
                             : elem;
                if (structInto(k, r)) continue;
                Symbol* val = k->kind == NodeKind::InitList ? initList(k, elem) : expr(k, &elem);
                store(r, val, k);
            }
            return;
        }
        if (t.is_structure()) {
            StructSpec* spec = t.structspec();
            if (int(init->kids.size()) > spec->numfields()) {
                error(at, "Too many initializers for struct '" + spec->name().string() + "'");
                return;
            }
            LRef whole;
            whole.sym = var;
            whole.type = t;
            storeFields(init, whole);
            return;
        }
        Symbol* val = initList(init, t);
        assignInto(var, val, at);
        return;
    }
    Symbol* val = exprInto(init, var, &t);
    if (!val) return;
    if (t.is_structure_based() || val->type.is_structure_based()) {
        if (!(t == val->type) && !equivalent(t, val->type)) {
            error(at, std::string(isDecl ? "Cannot initialize " : "Cannot assign ") + t.string() +
                          " " + at->name + " = " + val->type.string());
            return;
        }
    } else if (t.is_closure_based() || val->type.is_closure_based()) {
        bool zero =
            val->isConst() && val->type.is_int() && !val->ivals.empty() && val->ivals[0] == 0;
        if (!(t.is_closure_based() && (val->type.is_closure_based() || zero))) {
            error(at, std::string(isDecl ? "Cannot initialize " : "Cannot assign ") + t.string() +
                          " " + at->name + " = " + val->type.string());
            return;
        }
    } else if (t.is_int() && val->type.is_float()) {
        warning(at, "Assignment may lose precision: " + t.string() + " " + at->name + " = " +
                        val->type.string());
    } else if (!assignCompatible(t, val->type) && !(t.is_int() && val->type.is_float())) {
        if (!(t.is_array() && val->type.is_array() &&
              equivalent(t.elementtype(), val->type.elementtype()))) {
            error(at, std::string(isDecl ? "Cannot initialize " : "Cannot assign ") + t.string() +
                          " " + at->name + " = " + val->type.string());
            return;
        }
    }
    assignInto(var, val, at);
}

// Structs and arrays have no truth value; closures have one (whether they are empty) for `if`
// only. `as` ends the message: "as an 'if' condition", "as a condition".
void CodeGen::conditionCheck(const TypeSpec& t, const Node* at, const std::string& as,
                             bool closureOk) {
    if (t.is_closure_based() && !closureOk) error(at, "Cannot use a closure " + as);
    if (t.is_structure_based() && !t.is_array()) error(at, "Cannot use a struct " + as);
    if (t.is_array()) error(at, "Cannot use an array " + as);
}

void CodeGen::ifStatement(const Node* s) {
    Symbol* cond = expr(s->kid(0));
    conditionCheck(cond->type, s, "as an 'if' condition", true);
    m_curLine = s->line;
    m_curFile = s->file;
    if (!cond->type.is_int()) {
        Symbol* t = temp(TypeSpec(TypeDesc::TypeInt));
        emit("neq", {t, cond, constInt(0)});
        cond = t;
    }
    int ifop = emit("if", {cond}, "r");
    statement(s->kid(1));
    int elseStart = nextOp();
    statement(s->kid(2));
    (*m_ops)[ifop].jumps = {elseStart, nextOp()};
}

void CodeGen::loop(const Node* s) {
    pushScope();
    const char* opname = s->loop == LoopKind::For     ? "for"
                         : s->loop == LoopKind::While ? "while"
                                                      : "dowhile";
    int loopop = emit(opname, {nullptr}, "r");
    statement(s->kid(0));
    int condStart = nextOp();
    Symbol* cond = nullptr;
    const Node* c = s->kid(1);
    if (c && c->kind != NodeKind::Empty) {
        cond = expr(c);
        m_curLine = s->line;
        m_curFile = s->file;
        conditionCheck(cond->type, s, std::string("as an '") + opname + "' condition", false);
        Symbol* t = temp(TypeSpec(TypeDesc::TypeInt));
        emit("neq", {t, cond, constInt(0)});
        cond = t;
    } else {
        // A loop without a condition tests the constant 1, as oslc writes it.
        cond = temp(TypeSpec(TypeDesc::TypeInt));
        emit("neq", {cond, constInt(1), constInt(0)});
    }
    int bodyStart = nextOp();
    m_loops.push_back({});
    statement(s->kid(3));
    m_loops.pop_back();
    int stepStart = nextOp();
    const Node* step = s->kid(2);
    if (step && step->kind != NodeKind::Empty) {
        m_curLine = step->line;
        expr(step);
    }
    int end = nextOp();
    Op& op = (*m_ops)[loopop];
    op.args[0] = cond;
    op.jumps = {condStart, bodyStart, stepStart, end};
    popScope();
}

void CodeGen::returnStatement(const Node* s) {
    if (m_inline.empty()) {
        // `return` in the shader body ends the shader.
        if (s->kid(0)) error(s, "Cannot return a value from a shader body");
        emit("exit", {}, "");
        return;
    }
    size_t fi = m_inline.size() - 1;
    m_sawReturn = true;
    if (s->kid(0)) {
        if (!m_inline[fi].result) {
            error(s, "Cannot return a value from a void function");
            return;
        }
        TypeSpec rt = m_inline[fi].fn->ret;
        Symbol* v = exprInto(s->kid(0), m_inline[fi].result, &rt);
        InlineFrame& f = m_inline[fi];
        if (!assignCompatible(f.fn->ret, v->type)) {
            error(s, "Cannot return a '" + v->type.string() + "' from '" + f.fn->ret.string() +
                         " " + f.fn->name + "()'");
            return;
        }
        assignInto(f.result, v, s);
    } else if (m_inline[fi].result) {
        error(s, "You must return a '" + m_inline[fi].fn->ret.string() + "' from '" +
                     m_inline[fi].fn->name + "()'");
    }
    int op = emit("return", {}, "");
    m_inline[fi].returnOps.push_back(op);
    // oslc keeps the `return` after a conditional expression even at the end of the body.
    if (s->kid(0) && s->kid(0)->kind == NodeKind::Ternary) m_inline[fi].keptReturns.insert(op);
}

} // namespace OSL::pvt
