// Expressions: type rules, implicit conversions, l-values (array elements, components, matrix
// cells, struct fields), calls with overload resolution, and inlining of user functions.
#include "codegen.h"
#include "format_check.h"

#include <algorithm>
#include <functional>

namespace OSL::pvt {

namespace {
const TypeSpec kInt(TypeDesc::TypeInt);
const TypeSpec kFloat(TypeDesc::TypeFloat);
const TypeSpec kString(TypeDesc::TypeString);

const Symbol* rootOf(const Symbol* s) {
    while (s && s->aliasOf) s = s->aliasOf;
    while (s && s->structParent) s = s->structParent;
    return s;
}

bool isZeroConst(const Symbol* s) {
    return s->isConst() && ((s->type.is_int() && !s->ivals.empty() && s->ivals[0] == 0) ||
                            (s->type.is_float() && !s->fvals.empty() && s->fvals[0] == 0.f));
}

int componentIndex(const TypeSpec& t, const std::string& name) {
    static const char* const xyz[] = {"x", "y", "z"};
    static const char* const rgb[] = {"r", "g", "b"};
    for (int i = 0; i < 3; ++i)
        if (name == (t.is_color() ? rgb[i] : xyz[i])) return i;
    return -1;
}
} // namespace

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
    static const std::map<std::string, std::string> overloadNames = {
        {"+", "add"},   {"-", "sub"}, {"*", "mul"},  {"/", "div"}, {"%", "mod"}, {"==", "eq"},
        {"!=", "ne"},   {"<", "lt"},  {">", "gt"},   {"<=", "le"}, {">=", "ge"}, {"&", "bitand"},
        {"|", "bitor"}, {"^", "xor"}, {"<<", "shl"}, {">>", "shr"}};
    // A user-defined operator wins over the built-in meaning.
    if (dest && (rootOf(a) == rootOf(dest) || rootOf(b) == rootOf(dest))) dest = nullptr;
    if (Symbol* r = operatorCall("__operator__" + overloadNames.at(e->op) + "__", {a, b}, e, dest))
        return r;
    bool ok = true;
    TypeSpec rt = arithmeticResult(e->op, a->type, b->type, ok);
    if (!ok) {
        error(e, "Not allowed: '" + a->type.string() + " " + e->op + " " + b->type.string() + "'");
        return temp(rt);
    }
    static const std::map<std::string, std::string> names = {
        {"+", "add"},   {"-", "sub"}, {"*", "mul"},  {"/", "div"}, {"%", "mod"}, {"==", "eq"},
        {"!=", "neq"},  {"<", "lt"},  {">", "gt"},   {"<=", "le"}, {">=", "ge"}, {"&", "bitand"},
        {"|", "bitor"}, {"^", "xor"}, {"<<", "shl"}, {">>", "shr"}};
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
    emit(names.at(e->op), {r, a, b});
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
    static const std::map<std::string, std::string> names = {
        {"+", "add"},    {"-", "sub"},   {"*", "mul"}, {"/", "div"},  {"%", "mod"},
        {"&", "bitand"}, {"|", "bitor"}, {"^", "xor"}, {"<<", "shl"}, {">>", "shr"}};
    if (v->type.is_int() && !cur->type.is_int()) v = convert(v, kFloat, e);
    bool direct = !r.index && !r.comp && equivalent(rt, cur->type);
    Symbol* dst = direct ? r.sym : temp(rt);
    if (direct) checkWritable(r.sym, e);
    // Updating a read-only global in place is allowed, with a warning (a plain `=` is refused).
    Symbol* root = r.sym;
    while (root && root->structParent) root = root->structParent;
    if (root && root->symtype == SymTypeGlobal && m_nonWritableGlobals.count(root->name))
        warning(e, "cannot write to non-output parameter \"" + root->name + "\"");
    emit(names.at(op), {dst, cur, v});
    if (!direct) store(r, dst, e);
    return dst;
}

Symbol* CodeGen::ternary(const Node* e, Symbol* dest) {
    Symbol* c = expr(e->kid(0));
    m_curLine = e->line;
    if (c->type.is_closure_based()) error(e, "Cannot use a closure as a condition");
    conditionCheck(c->type, e, "as a condition");
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

Symbol* CodeGen::initList(const Node* e, const TypeSpec& t) {
    if (t.is_array()) {
        TypeSpec elem = t.elementtype();
        if (t.is_sized_array() && int(e->kids.size()) > t.arraylength()) {
            error(e, "Too many initializers for a '" + t.string() + "'");
            return temp(t);
        }
        TypeSpec at = t;
        if (t.is_unsized_array()) at.make_array(int(std::max<size_t>(1, e->kids.size())));
        if (Symbol* folded = constArray(e, at)) {
            Symbol* r = temp(at);
            emit("assign", {r, folded});
            return r;
        }
        Symbol* r = temp(at);
        for (size_t i = 0; i < e->kids.size(); ++i) {
            const Node* k = e->kid(i);
            Symbol* v = k->kind == NodeKind::InitList ? initList(k, elem) : expr(k, &elem);
            emit("aassign", {r, constInt(int(i)), arrayElement(v, elem, k)});
        }
        return r;
    }
    if (t.is_structure()) {
        StructSpec* spec = t.structspec();
        if (int(e->kids.size()) > spec->numfields()) {
            error(e, "Too many initializers for struct '" + spec->name().string() + "'");
            return temp(t);
        }
        Symbol* r = temp(t);
        for (size_t i = 0; i < e->kids.size(); ++i) {
            const Node* k = e->kid(i);
            TypeSpec ft = spec->field(int(i)).type;
            Symbol* v = k->kind == NodeKind::InitList ? initList(k, ft) : expr(k, &ft);
            if (!assignCompatible(ft, v->type)) {
                error(k, "Can't assign '" + v->type.string() + "' to '" + ft.string() + " " +
                             spec->name().string() + "." + spec->field(int(i)).name.string() + "'");
                continue;
            }
            assignInto(r->fields[i], v, k);
        }
        return r;
    }
    if (t.is_triple() || t.is_matrix()) {
        // `{a, b, c}` for a triple reads as its constructor.
        std::vector<Symbol*> args;
        for (const auto& k : e->kids) {
            Symbol* a = expr(k.get());
            args.push_back(a->type.is_string() ? a : convert(a, kFloat, k.get()));
        }
        size_t want = t.is_matrix() ? 16 : 3;
        if (Symbol* folded = foldTriple(t, args)) return folded;
        Symbol* r = temp(t);
        bool space = args.size() == want + 1 && args[0]->type.is_string();
        if (args.size() == 1) {
            emit("assign", {r, args[0]});
        } else if (args.size() == want || space) {
            args.insert(args.begin(), r);
            emit(t.string(), args);
        } else {
            error(e, "Too many initializers for a '" + t.string() + "'");
        }
        return r;
    }
    if (e->kids.size() == 1) return expr(e->kid(0), &t);
    error(e, "Too many initializers for a '" + t.string() + "'");
    return temp(t);
}

// ---------------------------------------------------------------- calls

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

// Whether `e` reads any part of the variable `root` (a struct read while it is rebuilt).
bool CodeGen::mentions(const Node* e, const Symbol* root) {
    if (!e) return false;
    if (e->kind == NodeKind::VarRef) {
        const Symbol* s = lookupVar(e->name);
        return s && rootOf(s) == root;
    }
    for (const auto& k : e->kids)
        if (mentions(k.get(), root)) return true;
    return false;
}

// A struct constructor writes its fields straight into `dest` when given one (the variable it
// initialises or the result of the function returning it), as oslc does.
Symbol* CodeGen::structCtor(const Node* e, int structId, Symbol* dest) {
    StructSpec* spec = TypeSpec::structspec(structId);
    TypeSpec t(e->name.c_str(), structId);
    if (int(e->kids.size()) != spec->numfields()) {
        error(e, "Constructor for '" + e->name + "' has the wrong number of arguments (expected " +
                     std::to_string(spec->numfields()) + ", got " + std::to_string(e->kids.size()) +
                     ")");
    }
    if (int(e->kids.size()) > spec->numfields())
        error(e, "Too many initializers for struct '" + e->name + "'");
    Symbol* r = dest ? dest : temp(t);
    for (size_t i = 0; i < e->kids.size() && int(i) < spec->numfields(); ++i) {
        TypeSpec ft = spec->field(int(i)).type;
        Symbol* v = expr(e->kid(i), &ft);
        if (!assignCompatible(ft, v->type)) {
            error(e, "Can't assign '" + v->type.string() + "' to '" + ft.string() + " " + e->name +
                         "." + spec->field(int(i)).name.string() + "'");
            continue;
        }
        assignInto(r->fields[i], v, e);
    }
    return r;
}

// A struct written as an init list or by its constructor, stored field by field straight into
// `dst` (a struct variable, field or array element), as oslc writes it. False, having emitted
// nothing, when `e` is not such a value.
bool CodeGen::structInto(const Node* e, const LRef& dst) {
    if (!e || !dst.sym || dst.comp || m_checkOnly || !dst.type.is_structure()) return false;
    int id = dst.type.structure();
    if (e->kind == NodeKind::Call) {
        auto st = m_structs.find(e->name);
        if (st == m_structs.end() || st->second != id) return false;
    } else if (e->kind != NodeKind::InitList) {
        return false;
    }
    StructSpec* spec = dst.type.structspec();
    if (int(e->kids.size()) > spec->numfields() ||
        (e->kind == NodeKind::Call && int(e->kids.size()) != spec->numfields()) ||
        dst.sym->fields.size() != size_t(spec->numfields()) || mentions(e, rootOf(dst.sym)))
        return false;
    m_curLine = e->line, m_curFile = e->file;
    for (size_t i = 0; i < e->kids.size(); ++i) {
        const Node* k = e->kid(i);
        TypeSpec ft = spec->field(int(i)).type;
        LRef f;
        f.sym = dst.sym->fields[i];
        f.index = dst.index;
        f.type = ft.is_structure_based() && dst.index
                     ? TypeSpec(ft.structspec()->name().c_str(), ft.structure())
                     : ft;
        if (structInto(k, f)) continue;
        Symbol* v = k->kind == NodeKind::InitList ? initList(k, ft) : expr(k, &ft);
        if (!assignCompatible(ft, v->type) && !(ft.is_closure() && v->isConst())) {
            error(k, "Can't assign '" + v->type.string() + "' to '" + ft.string() + " " +
                         spec->name().string() + "." + spec->field(int(i)).name.string() + "'");
            continue;
        }
        store(f, v, k, false);
    }
    return true;
}

bool CodeGen::canTarget(const Symbol* dest, const TypeSpec& t) const {
    if (dest && dest->type.is_structure() && t.is_structure() && equivalent(dest->type, t) &&
        dest->fields.size() == size_t(t.structspec()->numfields()))
        return true;
    if (!dest || dest->type.is_array() || dest->type.is_structure_based() ||
        !dest->fields.empty() || dest->type.is_closure_based() || t.is_array() ||
        t.is_structure_based())
        return false;
    return dest->type == t || (dest->type.is_triple() && t.is_triple());
}

// Generates `e` with its value written into `dest` where oslc does so: a conditional expression
// computes each branch into it and a user function returns into it. Other expressions are
// generated as usual (their last op is retargeted by assignInto).
Symbol* CodeGen::exprInto(const Node* e, Symbol* dest, const TypeSpec* expected) {
    if (e && dest && !m_checkOnly && dest->type.is_structure() && e->kind == NodeKind::Call) {
        // A struct built by its constructor or returned by a function lands in place, unless
        // the expression still reads the struct being written.
        m_curLine = e->line, m_curFile = e->file;
        auto st = m_structs.find(e->name);
        if (st != m_structs.end())
            return structCtor(e, st->second,
                              canTarget(dest, TypeSpec(e->name.c_str(), st->second)) &&
                                      !mentions(e, rootOf(dest))
                                  ? dest
                                  : nullptr);
        return call(e, expected, dest);
    }
    if (e && dest && !m_checkOnly && dest->type.is_structure() && e->kind == NodeKind::InitList) {
        LRef whole;
        whole.sym = dest;
        whole.type = dest->type;
        if (structInto(e, whole)) return dest;
    }
    if (e && dest && !m_checkOnly && dest->type.is_structure() && e->kind == NodeKind::Binary &&
        e->op != "&&" && e->op != "||") {
        m_curLine = e->line, m_curFile = e->file;
        return binary(e, expected, dest);
    }
    if (e && dest && !m_checkOnly && dest->type.is_structure() && e->kind == NodeKind::Unary) {
        m_curLine = e->line, m_curFile = e->file;
        return unary(e, dest);
    }
    if (e && dest && !m_checkOnly && !dest->type.is_array() && !dest->type.is_closure_based() &&
        !dest->type.is_structure_based() && dest->fields.empty()) {
        if (e->kind == NodeKind::Ternary) {
            m_curLine = e->line, m_curFile = e->file;
            return ternary(e, dest);
        }
        if (e->kind == NodeKind::Call) {
            m_curLine = e->line, m_curFile = e->file;
            return call(e, expected, dest);
        }
    }
    return expr(e, expected);
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
                if (v->type.is_triple() && !v->type.is_array()) {
                    args.push_back(v);
                    refs.push_back(r);
                    types.push_back(t);
                    continue;
                }
                args.push_back(construct(a, t, {v}));
                refs.push_back(r);
                types.push_back(args.back()->type);
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
    if (dest &&
        (!canTarget(dest, fn->ret) || std::find(args.begin(), args.end(), dest) != args.end()))
        dest = nullptr;
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
