// Expressions: type rules, implicit conversions, l-values (array elements, components, matrix
// cells, struct fields), operators, conditionals, constructors and casts.
#include "codegen.h"
#include "codegen_internal.h"

#include <algorithm>
#include <functional>

namespace OSL::pvt {

bool assignCompatible(const TypeSpec& dst, const TypeSpec& src) {
    if (assignable(dst, src) || equivalent(dst, src)) return true;
    if (dst.is_triple() && src.is_triple()) return true;
    if (dst.is_array() && src.is_array() && !dst.is_closure_based() && !src.is_closure_based()) {
        TypeSpec a = dst.elementtype(), b = src.elementtype();
        return (a == b || (a.is_triple() && b.is_triple())) &&
               (dst.arraylength() == src.arraylength() || dst.is_unsized_array());
    }
    return false;
}

Symbol* CodeGen::expr(const Node* e, const TypeSpec* expected) {
    if (!e) return temp(kFloat);
    if (e->kind != NodeKind::Empty) m_curLine = e->line, m_curFile = e->file;
    Symbol* r = nullptr;
    switch (e->kind) {
    case NodeKind::IntLit:
        r = constInt(int(e->intValue));
        break;
    case NodeKind::FloatLit:
        r = constFloat(float(e->floatValue));
        break;
    case NodeKind::StringLit:
        r = constString(e->stringValue);
        break;
    case NodeKind::VarRef: {
        r = lookupVar(e->name);
        if (!r) {
            if (m_structs.count(e->name))
                error(e, "type name '" + e->name + "' can't be used as a variable");
            else if (m_functions.count(e->name))
                error(e, "function '" + e->name + "' can't be used as a variable");
            else
                error(e, "'" + e->name + "' was not declared in this scope");
            r = temp(TypeSpec());
        }
        break;
    }
    case NodeKind::Index:
    case NodeKind::Field:
        r = load(lvalue(e, false), e);
        break;
    case NodeKind::Unary:
        r = unary(e);
        break;
    case NodeKind::PreIncDec:
    case NodeKind::PostIncDec:
        r = incdec(e);
        break;
    case NodeKind::Binary:
        r = (e->op == "&&" || e->op == "||") ? logical(e) : binary(e, expected);
        break;
    case NodeKind::Ternary:
        r = ternary(e);
        break;
    case NodeKind::Assign:
        r = assign(e);
        break;
    case NodeKind::Call:
        r = call(e, expected);
        break;
    case NodeKind::TypeCtor:
        r = typeCtor(e);
        break;
    case NodeKind::InitList:
        if (expected) {
            r = initList(e, *expected);
        } else {
            error(e, "Cannot use an initializer list here");
            r = temp(kFloat);
        }
        break;
    case NodeKind::Comma:
        if (e->parenthesized)
            warning(e, "Comma operator inside parenthesis is probably an error -- it is not a "
                       "vector/color.");
        for (const auto& k : e->kids) r = expr(k.get());
        break;
    default:
        r = temp(kFloat);
        break;
    }
    const_cast<Node*>(e)->type = r->type;
    return r;
}

Symbol* CodeGen::convert(Symbol* v, const TypeSpec& to, const Node* at) {
    const TypeSpec& from = v->type;
    if (from == to || to.is_structure_based() || to.is_closure_based() || from.is_closure_based() ||
        to.is_unknown() || from.is_unknown())
        return v;
    if (to.is_array() || from.is_array()) return v;
    if (equivalent(to, from)) return v;
    if (v->isConst() && from.is_scalarnum() && (to.is_float() || to.is_triple() || to.is_int())) {
        float f = from.is_int() ? float(v->ivals[0]) : v->fvals[0];
        if (to.is_float()) return constFloat(f);
        if (to.is_int()) return constInt(int(f));
        return constant(to, {}, {f, f, f}, {});
    }
    if (!assignable(to, from) && !(to.is_int() && from.is_float())) return v;
    Symbol* t = temp(to);
    (void)at;
    emit("assign", {t, v});
    return t;
}

void CodeGen::assignInto(Symbol* dst, Symbol* src, const Node* at) {
    if (dst == src) return; // computed in place (see exprInto)
    if (dst->type.is_structure_based()) {
        if (!equivalent(dst->type, src->type) || dst->fields.size() != src->fields.size()) return;
        for (size_t i = 0; i < dst->fields.size(); ++i)
            assignInto(dst->fields[i], src->fields[i], at);
        return;
    }
    if (dst->type.is_array() && src->type.is_array()) {
        emit("arraycopy", {dst, src});
        return;
    }
    if (retarget(dst, src)) return;
    emit("assign", {dst, src});
}

// A value computed into a fresh temporary by the op just emitted is written straight into its
// destination instead, as oslc generates an expression into the variable it is assigned to.
bool CodeGen::retarget(Symbol* dst, Symbol* src) {
    // Triples of any kind share one layout, so a vector op may write a point (as oslc does).
    bool sameKind = dst->type == src->type ||
                    (dst->type.is_triple() && src->type.is_triple() && !src->type.is_array());
    if (src->symtype != SymTypeTemp || !src->fields.empty() || src->bornAt < 0 ||
        dst->type.is_array() || !sameKind || m_ops->empty())
        return false;
    int last = int(m_ops->size()) - 1;
    Op& op = (*m_ops)[last];
    if (op.args.empty() || op.args[0] != src || op.rw.empty() || op.rw[0] != 'w' ||
        !op.jumps.empty())
        return false;
    for (size_t a = 1; a < op.args.size(); ++a)
        if (op.args[a] == src || (op.args[a] == dst && op.rw[a] != 'r')) return false;
    for (int i = last - 1; i >= src->bornAt && i >= 0; --i)
        for (Symbol* a : (*m_ops)[i].args)
            if (a == src) return false;
    op.args[0] = dst;
    src->renamedTo = dst;
    return true;
}

void CodeGen::checkWritable(Symbol* s, const Node* at, const std::string& context,
                            bool plainAssign) {
    Symbol* root = s;
    while (root->structParent) root = root->structParent;
    bool funcParam = root->symtype == SymTypeParam && m_currentFunction;
    // Like the reference compiler, only a plain `=` into a read-only global is refused.
    bool global =
        plainAssign && root->symtype == SymTypeGlobal && m_nonWritableGlobals.count(root->name);
    if (funcParam || global)
        error(at, "cannot write to non-output parameter \"" + root->name + "\"" + context);
    if (root->isConst()) error(at, "cannot write to a constant");
}

CodeGen::LRef CodeGen::lvalue(const Node* e, bool forWrite) {
    LRef r;
    if (e->kind == NodeKind::VarRef) {
        Symbol* s = lookupVar(e->name);
        if (!s) {
            expr(e); // reports the problem
            s = temp(TypeSpec());
        }
        r.sym = s;
        r.type = s->type;
        return r;
    }
    if (e->kind == NodeKind::Field) {
        LRef b = lvalue(e->kid(0), forWrite);
        if (b.type.is_structure_based() && !b.comp) {
            StructSpec* spec = b.type.structspec();
            int k = spec ? spec->lookup_field(ustring(e->name)) : -1;
            if (k < 0 || size_t(k) >= b.sym->fields.size()) {
                error(e, "struct type '" + (spec ? spec->name().string() : std::string("?")) +
                             "' does not have a member '" + e->name + "'");
                r.sym = temp(kFloat);
                r.type = kFloat;
                return r;
            }
            r.sym = b.sym->fields[k];
            r.index = b.index;
            r.type = spec->field(k).type;
            if (b.index && r.type.is_structure_based())
                r.type = TypeSpec(r.type.structspec()->name().c_str(), r.type.structure());
            return r;
        }
        if (b.type.is_triple() && !b.comp) {
            int k = componentIndex(b.type, e->name);
            if (k < 0) {
                error(e, "type '" + b.type.string() + "' does not have a member '" + e->name + "'");
                k = 0;
            }
            r = b;
            r.comp = constInt(k);
            r.type = kFloat;
            return r;
        }
        error(e, "type '" + b.type.string() + "' does not have a member '" + e->name + "'");
        r.sym = temp(kFloat);
        r.type = kFloat;
        return r;
    }
    if (e->kind == NodeKind::Index) {
        LRef b = lvalue(e->kid(0), forWrite);
        Symbol* idx = expr(e->kid(1));
        if (!idx->type.is_int() && !idx->type.is_unknown())
            error(e, std::string(b.type.is_array() ? "array" : "component") +
                         " index must be an integer, not a " + idx->type.string());
        m_curLine = e->line;
        if (b.type.is_array() && !b.index && !b.comp) {
            r = b;
            r.index = idx;
            r.type = b.type.elementtype();
            if (r.type.is_structure_based())
                r.type = TypeSpec(r.type.structspec()->name().c_str(), r.type.structure());
            return r;
        }
        if (b.type.is_triple() && !b.comp) {
            r = b;
            r.comp = idx;
            r.type = kFloat;
            return r;
        }
        if (b.type.is_matrix() && !b.comp) {
            r = b;
            r.comp = idx;
            r.type = TypeSpec(); // a matrix row: only usable with a second index
            return r;
        }
        if (b.sym && b.sym->type.elementtype().is_matrix() && b.comp && !b.comp2 &&
            b.type.is_unknown()) {
            r = b;
            r.comp2 = idx;
            r.type = kFloat;
            return r;
        }
        error(e, "indexing into non-array or non-component type");
        r.sym = temp(kFloat);
        r.type = kFloat;
        return r;
    }
    // Any other expression: an r-value held in a temporary.
    Symbol* v = expr(e);
    if (forWrite) error(e, "Can't assign via = to something that isn't an lvalue");
    r.sym = v;
    r.type = v->type;
    return r;
}

Symbol* CodeGen::load(const LRef& r, const Node* at) {
    if (!r.sym) return temp(kFloat);
    if (r.sym->type.elementtype().is_matrix() && r.comp && !r.comp2) {
        error(at, "indexing into non-array or non-component type");
        return temp(kFloat);
    }
    Symbol* base = r.sym;
    if (r.index) {
        TypeSpec et = r.sym->type.elementtype();
        if (r.sym->type.is_structure_based()) {
            Symbol* t = temp(TypeSpec(et.structspec()->name().c_str(), et.structure()));
            std::function<void(Symbol*, Symbol*)> copy = [&](Symbol* dst, Symbol* src) {
                if (dst->fields.empty()) {
                    emit("aref", {dst, src, r.index});
                    return;
                }
                for (size_t i = 0; i < dst->fields.size() && i < src->fields.size(); ++i)
                    copy(dst->fields[i], src->fields[i]);
            };
            copy(t, r.sym);
            base = t;
        } else {
            Symbol* t = temp(et);
            emit("aref", {t, r.sym, r.index});
            base = t;
        }
    }
    if (r.comp2) {
        Symbol* t = temp(kFloat);
        emit("mxcompref", {t, base, r.comp, r.comp2});
        return t;
    }
    if (r.comp) {
        Symbol* t = temp(kFloat);
        emit("compref", {t, base, r.comp});
        return t;
    }
    return base;
}

// The value stored into an array element of type `et`. The op converts one number into
// another itself; a number stored into a triple element is widened by an `assign` first, even
// when it is a constant, as oslc does.
Symbol* CodeGen::arrayElement(Symbol* value, const TypeSpec& et, const Node* at) {
    if (et.is_scalarnum() && value->type.is_scalarnum()) return value;
    if (!et.is_triple() || et.is_array() || !value->type.is_scalarnum())
        return convert(value, et, at);
    Symbol* t = temp(et);
    emit("assign", {t, value});
    return t;
}

void CodeGen::store(const LRef& r, Symbol* value, const Node* at, bool checkWrite) {
    if (!r.sym) return;
    if (checkWrite) checkWritable(r.sym, at);
    if (r.sym->type.elementtype().is_matrix() && r.comp && !r.comp2) {
        error(at, "indexing into non-array or non-component type");
        return;
    }
    if (!r.index && !r.comp) {
        assignInto(r.sym, value, at);
        return;
    }
    // A component takes an int as it is: the op converts it, so oslc emits no conversion.
    const auto component = [&] {
        return value->type.is_int() ? value : convert(value, kFloat, at);
    };
    if (r.comp && !r.comp2 && !r.index) {
        emit("compassign", {r.sym, r.comp, component()});
        return;
    }
    if (r.comp2 && !r.index) {
        emit("mxcompassign", {r.sym, r.comp, r.comp2, component()});
        return;
    }
    // An array element, possibly one component of it.
    TypeSpec et = r.sym->type.elementtype();
    if (r.sym->type.is_structure_based()) {
        std::function<void(Symbol*, Symbol*)> copy = [&](Symbol* dst, Symbol* src) {
            if (dst->fields.empty()) {
                emit("aassign", {dst, r.index, src});
                return;
            }
            for (size_t i = 0; i < dst->fields.size() && i < src->fields.size(); ++i)
                copy(dst->fields[i], src->fields[i]);
        };
        copy(r.sym, value);
        return;
    }
    if (!r.comp) {
        emit("aassign", {r.sym, r.index, arrayElement(value, et, at)});
        return;
    }
    Symbol* elem = temp(et);
    emit("aref", {elem, r.sym, r.index});
    if (r.comp2)
        emit("mxcompassign", {elem, r.comp, r.comp2, component()});
    else
        emit("compassign", {elem, r.comp, component()});
    emit("aassign", {r.sym, r.index, elem});
}

// The op of a binary operator (also of the operator in a compound assignment).
static const std::string& binaryOpName(const std::string& op) {
    static const std::map<std::string, std::string> names = {
        {"+", "add"},   {"-", "sub"}, {"*", "mul"},  {"/", "div"}, {"%", "mod"}, {"==", "eq"},
        {"!=", "neq"},  {"<", "lt"},  {">", "gt"},   {"<=", "le"}, {">=", "ge"}, {"&", "bitand"},
        {"|", "bitor"}, {"^", "xor"}, {"<<", "shl"}, {">>", "shr"}};
    return names.at(op);
}

static TypeSpec arithmeticResult(const std::string& op, const TypeSpec& a, const TypeSpec& b,
                                 bool& ok) {
    ok = true;
    if (a.is_unknown() || b.is_unknown()) return TypeSpec();
    bool cmp = op == "==" || op == "!=" || op == "<" || op == ">" || op == "<=" || op == ">=";
    if (a.is_structure_based() || b.is_structure_based() || a.is_array() || b.is_array()) {
        ok = false;
        return kFloat;
    }
    if (a.is_closure() || b.is_closure()) {
        if (op == "+" && a.is_closure() && b.is_closure()) return a;
        if (op == "*" && (a.is_closure() != b.is_closure())) {
            const TypeSpec& o = a.is_closure() ? b : a;
            if (o.is_float() || o.is_int() || o.is_color()) return a.is_closure() ? a : b;
        }
        ok = false;
        return kFloat;
    }
    if (a.is_string() || b.is_string()) {
        if ((op == "==" || op == "!=") && a.is_string() && b.is_string()) return kInt;
        ok = false;
        return kFloat;
    }
    if (cmp) {
        if ((op == "==" || op == "!=") || (a.is_scalarnum() && b.is_scalarnum())) return kInt;
        ok = false;
        return kInt;
    }
    if (op == "&" || op == "|" || op == "^" || op == "<<" || op == ">>") {
        ok = a.is_int() && b.is_int();
        return kInt;
    }
    if (a.is_matrix() || b.is_matrix()) {
        if ((op == "*" || op == "/") && (a.is_matrix() || a.is_scalarnum()) &&
            (b.is_matrix() || b.is_scalarnum()))
            return TypeSpec(TypeDesc::TypeMatrix);
        if ((op == "+" || op == "-") && (a.is_matrix() || a.is_scalarnum()) &&
            (b.is_matrix() || b.is_scalarnum()))
            return TypeSpec(TypeDesc::TypeMatrix);
        ok = false;
        return TypeSpec(TypeDesc::TypeMatrix);
    }
    if (a.is_triple() && b.is_triple()) {
        if (op == "-" && a.is_point() && b.is_point()) return TypeSpec(TypeDesc::TypeVector);
        return a;
    }
    if (a.is_triple()) return a;
    if (b.is_triple()) return b;
    if (a.is_int() && b.is_int()) return kInt;
    return kFloat;
}

Symbol* CodeGen::binary(const Node* e, const TypeSpec* expected, Symbol* dest) {
    // The type wanted of an arithmetic result is also wanted of its operands, so that
    // `color C = x * noise(P)` calls the colour noise, as oslc does.
    const bool arithmetic = e->op == "+" || e->op == "-" || e->op == "*" || e->op == "/";
    const TypeSpec* wanted = arithmetic && expected && !expected->is_void() ? expected : nullptr;
    const auto operand = [&](const Node* k) {
        return expr(k, k && k->kind != NodeKind::InitList ? wanted : nullptr);
    };
    Symbol* a = operand(e->kid(0));
    Symbol* b = operand(e->kid(1));
    m_curLine = e->line;
    m_curFile = e->file;
    // A user-defined operator wins over the built-in meaning.
    if (dest && (rootOf(a) == rootOf(dest) || rootOf(b) == rootOf(dest))) dest = nullptr;
    // The operator functions spell inequality "ne", the op "neq".
    const std::string opname = binaryOpName(e->op);
    const std::string overload = "__operator__" + (e->op == "!=" ? "ne" : opname) + "__";
    if (Symbol* r = operatorCall(overload, {a, b}, e, dest)) return r;
    bool ok = true;
    TypeSpec rt = arithmeticResult(e->op, a->type, b->type, ok);
    if (!ok) {
        error(e, "Not allowed: '" + a->type.string() + " " + e->op + " " + b->type.string() + "'");
        return temp(rt);
    }
    // Integers meet floats as floats in arithmetic; a comparison takes both as they are.
    const bool compare = e->op == "==" || e->op == "!=" || e->op == "<" || e->op == ">" ||
                         e->op == "<=" || e->op == ">=";
    bool floaty =
        rt.is_float_based() || (!rt.is_int() && !rt.is_closure_based()) ||
        ((a->type.is_float() || b->type.is_float() || a->type.is_triple() || b->type.is_triple()) &&
         !(a->type.is_int() && b->type.is_int()));
    floaty = floaty && !compare;
    if (floaty && !(rt.is_int() && a->type.is_int() && b->type.is_int())) {
        if (a->type.is_int() && !b->type.is_int()) a = convert(a, kFloat, e);
        if (b->type.is_int() && !a->type.is_int()) b = convert(b, kFloat, e);
    }
    // A weighted closure names the closure first, whichever side of `*` it was written on.
    if (rt.is_closure() && !a->type.is_closure()) std::swap(a, b);
    Symbol* r = temp(rt);
    emit(opname, {r, a, b});
    return r;
}

Symbol* CodeGen::logical(const Node* e) {
    Symbol* r = temp(kInt);
    Symbol* a = expr(e->kid(0));
    m_curLine = e->line;
    emit("neq", {r, a, isZeroConst(a) && a->type.is_float() ? constFloat(0) : constInt(0)});
    int ifop = emit("if", {r}, "r");
    int elseStart;
    if (e->op == "&&") {
        Symbol* b = expr(e->kid(1));
        Symbol* t = temp(kInt);
        emit("neq", {t, b, constInt(0)});
        emit("assign", {r, t});
        elseStart = nextOp();
    } else {
        elseStart = nextOp();
        Symbol* b = expr(e->kid(1));
        Symbol* t = temp(kInt);
        emit("neq", {t, b, constInt(0)});
        emit("assign", {r, t});
    }
    (*m_ops)[ifop].jumps = {elseStart, nextOp()};
    return r;
}

Symbol* CodeGen::unary(const Node* e, Symbol* dest) {
    const Node* k = e->kid(0);
    if (e->op == "-" && (k->kind == NodeKind::IntLit || k->kind == NodeKind::FloatLit)) {
        return k->kind == NodeKind::IntLit ? constInt(-int(k->intValue))
                                           : constFloat(-float(k->floatValue));
    }
    Symbol* a = expr(k);
    m_curLine = e->line;
    if (e->op == "+") return a;
    const char* overload = e->op == "-"   ? "__operator__neg__"
                           : e->op == "~" ? "__operator__compl__"
                                          : "__operator__not__";
    if (dest && rootOf(a) == rootOf(dest)) dest = nullptr;
    if (Symbol* r = operatorCall(overload, {a}, e, dest)) return r;
    if (a->type.is_structure_based() || a->type.is_array() || a->type.is_string()) {
        error(e, "Can't do '" + e->op + "' to a " + a->type.string() + ".");
        return temp(a->type);
    }
    if (e->op == "-") {
        Symbol* r = temp(a->type);
        emit("neg", {r, a});
        return r;
    }
    if (e->op == "~") {
        if (!a->type.is_int()) error(e, "Operator '~' can only be done to an int");
        Symbol* r = temp(kInt);
        emit("compl", {r, a});
        return r;
    }
    Symbol* r = temp(kInt);
    emit("eq", {r, a, constInt(0)});
    return r;
}

Symbol* CodeGen::incdec(const Node* e) {
    LRef r = lvalue(e->kid(0), true);
    Symbol* cur = load(r, e);
    if (!cur->type.is_int() && !cur->type.is_float()) {
        error(e, e->op + " can only be applied to an int or float");
        return cur;
    }
    Symbol* one = cur->type.is_int() ? constInt(1) : constFloat(1);
    Symbol* old = nullptr;
    if (e->kind == NodeKind::PostIncDec) {
        old = temp(cur->type);
        emit("assign", {old, cur});
    }
    Symbol* nv = (!r.index && !r.comp) ? r.sym : temp(cur->type);
    if (!r.index && !r.comp) checkWritable(r.sym, e);
    emit(e->op == "++" ? "add" : "sub", {nv, cur, one});
    if (r.index || r.comp) store(r, nv, e);
    return old ? old : nv;
}

Symbol* CodeGen::assign(const Node* e) {
    LRef r = lvalue(e->kid(0), true);
    const Node* rhs = e->kid(1);
    m_curLine = e->line;
    if (e->op == "=") {
        if (rhs->kind == NodeKind::InitList) {
            Symbol* v = initList(rhs, r.type);
            store(r, v, e);
            return v;
        }
        bool whole = !r.index && !r.comp && r.sym && !r.sym->isConst();
        // A field of one element of a struct array is read into a temporary first, and the
        // value is computed into that temporary, as oslc writes it.
        Symbol* element = nullptr;
        if (r.index && !r.comp && r.sym && r.sym->structParent &&
            r.sym->structParent->type.is_array() && !r.type.is_array() &&
            !r.type.is_structure_based() && !m_checkOnly) {
            element = temp(r.type);
            emit("aref", {element, r.sym, r.index});
        }
        Symbol* v = whole ? exprInto(rhs, r.sym, &r.type) : expr(rhs, &r.type);
        if (element && retarget(element, v)) v = element;
        m_curLine = e->line;
        const TypeSpec& t = r.type;
        std::string lhsName = e->kid(0)->kind == NodeKind::VarRef ? e->kid(0)->name : "";
        if (t.is_structure_based() || v->type.is_structure_based()) {
            if (!equivalent(t, v->type)) {
                error(e, "Cannot assign " + t.string() + " " + lhsName + " = " + v->type.string());
                return v;
            }
        } else if (t.is_closure_based() || v->type.is_closure_based()) {
            bool zero = v->isConst() && v->type.is_int() && !v->ivals.empty() && v->ivals[0] == 0;
            if (!(t.is_closure_based() && (v->type.is_closure_based() || zero))) {
                error(e, "Cannot assign " + t.string() + " " + lhsName + " = " + v->type.string());
                return v;
            }
        } else if (t.is_int() && v->type.is_float()) {
            warning(e, "Assignment may lose precision: " + t.string() + " " + lhsName + " = " +
                           v->type.string());
        } else if (!t.is_unknown() && !v->type.is_unknown() && !assignCompatible(t, v->type)) {
            error(e, "Cannot assign " + t.string() + " " + lhsName + " = " + v->type.string());
            return v;
        }
        checkWritable(r.sym, e, "", true);
        store(r, v, e, false);
        return v->renamedTo ? v->renamedTo : v;
    }
    Symbol* cur = load(r, e);
    Symbol* v = expr(rhs);
    m_curLine = e->line;
    std::string op = e->op.substr(0, e->op.size() - 1);
    bool ok = true;
    TypeSpec rt = arithmeticResult(op, cur->type, v->type, ok);
    if (!ok) {
        error(e, "Not allowed: '" + cur->type.string() + " " + op + " " + v->type.string() + "'");
        return cur;
    }
    if (v->type.is_int() && !cur->type.is_int()) v = convert(v, kFloat, e);
    bool direct = !r.index && !r.comp && equivalent(rt, cur->type);
    Symbol* dst = direct ? r.sym : temp(rt);
    if (direct) checkWritable(r.sym, e);
    // Updating a read-only global in place is allowed, with a warning (a plain `=` is refused).
    Symbol* root = r.sym;
    while (root && root->structParent) root = root->structParent;
    if (root && root->symtype == SymTypeGlobal && m_nonWritableGlobals.count(root->name))
        warning(e, "cannot write to non-output parameter \"" + root->name + "\"");
    emit(binaryOpName(op), {dst, cur, v});
    if (!direct) store(r, dst, e);
    return dst;
}

Symbol* CodeGen::ternary(const Node* e, Symbol* dest) {
    Symbol* c = expr(e->kid(0));
    m_curLine = e->line;
    conditionCheck(c->type, e, "as a condition", false);
    if (!c->type.is_int()) {
        Symbol* t = temp(kInt);
        emit("neq", {t, c, constInt(0)});
        c = t;
    }
    int ifop = emit("if", {c}, "r");
    // Each branch computes straight into the destination when there is one; otherwise the
    // result type comes from the first branch.
    Symbol* a = dest ? exprInto(e->kid(1), dest, &dest->type) : expr(e->kid(1));
    Symbol* r = dest ? dest : temp(a->type);
    // Both branches write r: it must not be retargeted by whatever consumes it afterwards.
    if (!dest) r->bornAt = ifop;
    if (!assignCompatible(r->type, a->type))
        error(e, "Incompatible types in ?: expression: " + r->type.string() + " and " +
                     a->type.string());
    else
        assignInto(r, a, e);
    int elseStart = nextOp();
    Symbol* b = dest ? exprInto(e->kid(2), dest, &dest->type) : expr(e->kid(2), &a->type);
    if (!assignCompatible(r->type, b->type) || !assignCompatible(a->type, b->type))
        error(e, "Incompatible types in ?: expression: " + a->type.string() + " and " +
                     b->type.string());
    else
        assignInto(r, b, e);
    (*m_ops)[ifop].jumps = {elseStart, nextOp()};
    return r;
}

// A triple built from numeric constants is itself a constant, as oslc makes it.
Symbol* CodeGen::foldTriple(const TypeSpec& t, const std::vector<Symbol*>& args) {
    if (!t.is_triple() || t.is_array() || (args.size() != 1 && args.size() != 3)) return nullptr;
    std::vector<float> fv;
    for (const Symbol* a : args) {
        if (!a->isConst() || a->type.is_array() || !a->type.is_scalarnum()) return nullptr;
        if (a->type.is_int() ? a->ivals.empty() : a->fvals.empty()) return nullptr;
        fv.push_back(a->type.is_int() ? float(a->ivals[0]) : a->fvals[0]);
    }
    if (fv.size() == 1) fv.assign(3, fv[0]);
    return constant(t, {}, fv, {});
}

Symbol* CodeGen::typeCtor(const Node* e) {
    TypeSpec t = resolveType(e->typeName, e);
    std::vector<Symbol*> args;
    // A cast steers an overloaded call toward the cast's type: `(color) noise(P)` is the
    // colour noise, not the float one converted.
    const bool steer = e->isCast && e->kids.size() == 1;
    for (const auto& k : e->kids) args.push_back(expr(k.get(), steer ? &t : nullptr));
    return construct(e, t, args);
}

// The value of constructor or cast `e` to type `t` from its evaluated arguments.
Symbol* CodeGen::construct(const Node* e, const TypeSpec& t, std::vector<Symbol*> args) {
    const bool steer = e->isCast && args.size() == 1;
    m_curLine = e->line;
    if (steer) {
        // A cast goes where an assignment could, and also from float to int and between
        // triples.
        const TypeSpec& from = args[0]->type;
        if (!from.is_unknown() && !assignable(t, from) && !(t.is_int() && from.is_float()) &&
            !(t.is_triple() && from.is_triple())) {
            error(e, "Cannot cast '" + from.string() + "' to '" + t.string() + "'");
            return temp(t);
        }
    }
    if (t.is_closure_based() || t.is_structure_based() || t.is_void()) {
        error(e, "Cannot construct a " + t.string());
        return temp(t);
    }
    if (args.size() == 1 && !args[0]->type.is_string()) {
        if (Symbol* folded = foldTriple(t, args)) return folded;
        const TypeSpec& from = args[0]->type;
        if (from.is_structure_based() || from.is_closure_based() || from.is_array() ||
            (from.is_string() != t.is_string()) || (t.is_scalarnum() && !from.is_scalarnum()) ||
            (t.is_triple() && from.is_matrix()) ||
            (t.is_matrix() && !from.is_scalarnum() && !from.is_matrix())) {
            error(e, "Cannot construct " + t.string() + " from " + from.string());
            return temp(t);
        }
        // A cast or constructor to the type the value already has is no conversion at all:
        // oslc passes the value through rather than copying it.
        if (from == t) return args[0];
        // `float(i)` takes a float argument: the int is converted on the way in, then copied.
        Symbol* r = temp(t);
        if (!e->isCast && t.is_float() && from.is_int()) args[0] = convert(args[0], kFloat, e);
        emit("assign", {r, args[0]});
        return r;
    }
    bool ok = false;
    size_t first = (!args.empty() && args[0]->type.is_string()) ? 1 : 0;
    size_t nums = args.size() - first;
    if (t.is_triple()) ok = nums == 3 || (first && nums == 1);
    if (t.is_matrix())
        ok = nums == 16 || (first && nums == 1) || (first && nums == 16) ||
             (first && args.size() == 2 && args[1]->type.is_string());
    for (size_t i = first; i < args.size() && ok; ++i)
        if (!(args[i]->type.is_scalarnum() || (t.is_matrix() && args[i]->type.is_string()) ||
              (nums == 1 && (args[i]->type.is_triple() || args[i]->type.is_matrix()))))
            ok = false;
    if (!ok) {
        std::string sig;
        for (size_t i = 0; i < args.size(); ++i) sig += (i ? ", " : "") + args[i]->type.string();
        error(e, "No matching function call to '" + t.string() + " (" + sig + ")'");
        return temp(t);
    }
    if (Symbol* folded = foldTriple(t, args)) return folded;
    for (size_t i = first; i < args.size(); ++i)
        if (args[i]->type.is_int()) args[i] = convert(args[i], kFloat, e);
    Symbol* r = temp(t);
    args.insert(args.begin(), r);
    emit(t.string(), args);
    return r;
}

} // namespace OSL::pvt
