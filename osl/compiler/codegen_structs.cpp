// Struct values and init lists: `{...}` lists, struct constructors, and values written straight
// into the variable, field or array element they are assigned to.
#include "codegen.h"
#include "codegen_internal.h"

#include <algorithm>
#include <functional>

namespace OSL::pvt {

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
        LRef r;
        r.sym = temp(t);
        r.type = t;
        storeFields(e, r);
        return r.sym;
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
    LRef r;
    r.sym = dest ? dest : temp(t);
    r.type = t;
    storeFields(e, r);
    return r.sym;
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
    storeFields(e, dst);
    return true;
}

// Stores the items of `e` (an init list, or a constructor's arguments) into the fields of the
// struct `dst` (a variable, field or array element) one by one. A nested struct value, and an
// array list into a field that is not an element's, are written straight into their field.
void CodeGen::storeFields(const Node* e, const LRef& dst) {
    StructSpec* spec = dst.type.structspec();
    const bool list = e->kind == NodeKind::InitList;
    for (size_t i = 0; i < e->kids.size() && int(i) < spec->numfields(); ++i) {
        const Node* k = e->kid(i);
        TypeSpec ft = spec->field(int(i)).type;
        LRef f;
        f.sym = dst.sym->fields[i];
        f.index = dst.index;
        f.type = ft.is_structure_based() && dst.index
                     ? TypeSpec(ft.structspec()->name().c_str(), ft.structure())
                     : ft;
        if (ft.is_array() && !dst.index && k->kind == NodeKind::InitList) {
            initVariable(f.sym, k, k, true);
            continue;
        }
        if (structInto(k, f)) continue;
        Symbol* v = k->kind == NodeKind::InitList ? initList(k, ft) : expr(k, &ft);
        // A list may give a closure field the constant 0; a constructor's argument may not.
        if (!assignCompatible(ft, v->type) && !(list && ft.is_closure() && v->isConst())) {
            error(list ? k : e, "Can't assign '" + v->type.string() + "' to '" + ft.string() + " " +
                                    spec->name().string() + "." +
                                    spec->field(int(i)).name.string() + "'");
            continue;
        }
        store(f, v, k, false);
    }
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

} // namespace OSL::pvt
