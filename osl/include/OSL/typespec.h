// Types as the OSL compiler, the OSO reader and the shading system see them: a simple OpenImageIO
// TypeDesc, a closure flag, or a struct by id in the process-wide struct registry; and symbol
// kinds.
#pragma once

#include <OSL/oslconfig.h>

#include <algorithm>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace OSL {

class StructSpec;

/// Kinds of symbols, numbered as OSL numbers them.
enum SymType {
    SymTypeParam,
    SymTypeOutputParam,
    SymTypeLocal,
    SymTypeTemp,
    SymTypeGlobal,
    SymTypeConst,
    SymTypeFunction,
    SymTypeType
};

/// A type as the toolchain sees it: a simple type (possibly an array), a closure of a simple type,
/// or a struct (possibly an array of structs) identified by its id in the struct registry.
class TypeSpec {
public:
    /// The unknown type.
    TypeSpec() : m_simple(TypeDesc::UNKNOWN), m_structure(0), m_closure(false) {}

    /// A simple type, including arrays of simple types.
    TypeSpec(TypeDesc simple) : m_simple(simple), m_structure(0), m_closure(false) {}

    /// A closure of a simple type when closure is true (its simple type becomes PTR).
    TypeSpec(TypeDesc simple, bool closure)
        : m_simple(closure ? TypeDesc(TypeDesc::PTR) : simple), m_structure(0), m_closure(closure) {
    }

    /// A struct, or an array of structs when arraylen is non-zero (-1 for unsized). With
    /// structid 0 the struct is looked up by name in the registry, and registered (without
    /// fields) when it is not there yet.
    TypeSpec(const char* name, int structid, int arraylen = 0);

    /// The type as OSL writes it: "float", "color[3]", "float[]", "closure color",
    /// "struct foo", "struct foo[2]".
    std::string string() const;

    /// Same as string(), as characters that stay valid for the life of the process.
    const char* c_str() const;

    friend std::ostream& operator<<(std::ostream& o, const TypeSpec& t) { return o << t.string(); }

    const TypeSpec& operator=(const TypeDesc simple) {
        m_simple = simple;
        m_structure = 0;
        m_closure = false;
        return *this;
    }

    bool operator==(const TypeSpec& x) const {
        return m_simple == x.m_simple && m_structure == x.m_structure && m_closure == x.m_closure;
    }
    bool operator!=(const TypeSpec& x) const { return !(*this == x); }

    /// The underlying simple type; UNKNOWN (with the array length) for structs, PTR for closures.
    const TypeDesc& simpletype() const { return m_simple; }

    bool is_unknown() const noexcept {
        return m_simple == TypeDesc::UNKNOWN && !m_structure && !m_closure;
    }

    bool is_closure() const { return m_closure && !is_array(); }
    bool is_closure_array() const { return m_closure && is_array(); }
    bool is_closure_based() const { return m_closure; }

    bool is_structure() const { return m_structure > 0 && !is_array(); }
    bool is_structure_array() const { return m_structure > 0 && is_array(); }
    bool is_structure_based() const { return m_structure > 0; }

    /// The struct id, 0 when this is not a struct.
    int structure() const { return m_structure; }

    /// The registered description of this struct, null when this is not a struct.
    StructSpec* structspec() const { return structspec(m_structure); }

    /// The struct registered under id, null for 0 or an id never handed out.
    ///
    /// The registry is shared by the whole process: any thread may register (registration is
    /// serialised inside) and any thread may look up by id without taking a lock (shading
    /// threads included). Entries are never removed, so the pointer stays valid. The thread that
    /// registers a struct fills its fields before handing its id to others; fields do not change
    /// afterwards.
    static StructSpec* structspec(int id);

    /// The id of the most recently registered struct with this name, or 0 when there is none;
    /// with add, registers an empty struct of that name when there is none.
    static int structure_id(const char* name, bool add = false);

    /// Registers a struct (the registry takes ownership) and returns its new id, or 0 when the
    /// registry is full (ids are 16-bit) or n is null.
    static int new_struct(StructSpec* n);

    /// A snapshot of the registry, indexed by id; entry 0 is always empty.
    static std::vector<std::shared_ptr<StructSpec>> struct_list();

    bool is_array() const { return m_simple.arraylen != 0; }
    bool is_unsized_array() const { return m_simple.arraylen < 0; }
    bool is_sized_array() const { return m_simple.arraylen > 0; }

    /// The array length: 0 for a non-array, -1 for an unsized array.
    int arraylength() const { return m_simple.arraylen; }

    /// The number of elements: 1 for a non-array (and for an unsized array).
    int numelements() const { return std::max(1, m_simple.arraylen); }

    /// Makes this an array of len elements (0: not an array, -1: unsized), keeping its element
    /// type.
    void make_array(int len) { m_simple.arraylen = len; }

    /// The type of one element; the type itself for a non-array.
    TypeSpec elementtype() const {
        TypeSpec t = *this;
        t.make_array(0);
        return t;
    }

    TypeDesc::AGGREGATE aggregate() const { return (TypeDesc::AGGREGATE)m_simple.aggregate; }

    bool is_int() const { return m_simple == TypeDesc::TypeInt && !is_closure(); }
    bool is_float() const { return m_simple == TypeDesc::TypeFloat && !is_closure(); }
    bool is_color() const { return m_simple == TypeDesc::TypeColor && !is_closure(); }
    bool is_point() const { return m_simple == TypeDesc::TypePoint && !is_closure(); }
    bool is_vector() const { return m_simple == TypeDesc::TypeVector && !is_closure(); }
    bool is_normal() const { return m_simple == TypeDesc::TypeNormal && !is_closure(); }
    bool is_string() const { return m_simple == TypeDesc::TypeString && !is_closure(); }
    bool is_string_based() const { return m_simple.basetype == TypeDesc::STRING; }
    bool is_int_based() const { return m_simple.basetype == TypeDesc::INT; }
    bool is_float_based() const { return m_simple.basetype == TypeDesc::FLOAT && !m_closure; }
    bool is_void() const { return m_simple == TypeDesc::NONE; }

    /// A single color, point, vector or normal (not an array, not a closure).
    bool is_triple() const {
        return !is_closure() && m_simple.aggregate == TypeDesc::VEC3 &&
               m_simple.basetype == TypeDesc::FLOAT && !m_simple.is_array();
    }
    /// A triple or an array of triples.
    bool is_triple_based() const {
        return !is_closure() && m_simple.aggregate == TypeDesc::VEC3 &&
               m_simple.basetype == TypeDesc::FLOAT;
    }
    bool is_triple_or_float() const {
        return !is_closure() &&
               (m_simple.aggregate == TypeDesc::VEC3 || m_simple.aggregate == TypeDesc::SCALAR) &&
               m_simple.basetype == TypeDesc::FLOAT && !m_simple.is_array();
    }
    /// A single int, float, triple or matrix (not an array, closure or struct).
    bool is_numeric() const {
        return !is_closure() && !is_array() &&
               (m_simple.basetype == TypeDesc::FLOAT || m_simple.basetype == TypeDesc::INT);
    }
    bool is_scalarnum() const { return is_numeric() && m_simple.aggregate == TypeDesc::SCALAR; }
    bool is_int_or_float() const { return is_scalarnum(); }
    /// A single point, vector or normal.
    bool is_vectriple() const {
        return !is_closure() &&
               (m_simple == TypeDesc::TypePoint || m_simple == TypeDesc::TypeVector ||
                m_simple == TypeDesc::TypeNormal);
    }
    /// A point, vector or normal, or an array of them.
    bool is_vectriple_based() const {
        TypeDesc elem = m_simple.elementtype();
        return elem == TypeDesc::TypePoint || elem == TypeDesc::TypeVector ||
               elem == TypeDesc::TypeNormal;
    }
    bool is_matrix() const { return m_simple == TypeDesc::TypeMatrix && !is_closure(); }
    bool is_color_closure() const { return is_closure(); }

    /// Identical types, or both vector-like triples of the same array-ness and closure-ness, or
    /// structs with the same field types.
    friend bool equivalent(const TypeSpec& a, const TypeSpec& b);

    /// Whether a value of type src may be assigned to dst: equivalent types, or an int or float
    /// into a float-based non-array, or a closure into a closure.
    friend bool assignable(const TypeSpec& dst, const TypeSpec& src) {
        if (dst.is_closure() || src.is_closure()) return dst.is_closure() && src.is_closure();
        return equivalent(dst, src) ||
               (dst.is_float_based() && !dst.is_array() && (src.is_float() || src.is_int()));
    }

private:
    TypeDesc m_simple; ///< the simple type, or UNKNOWN with the array length for structs
    short m_structure; ///< 0: not a struct; otherwise the registry id
    bool m_closure;    ///< a closure (m_simple then holds PTR)
};

bool equivalent(const TypeSpec& a, const TypeSpec& b);

/// The layout of an OSL struct: its name and its fields' types and names, in order.
class StructSpec {
public:
    StructSpec(ustring name, int scope) : m_name(name), m_scope(scope) {}

    struct FieldSpec {
        FieldSpec(const TypeSpec& t, ustring n) : type(t), name(n) {}
        TypeSpec type;
        ustring name;
    };

    void add_field(const TypeSpec& type, ustring name) { m_fields.emplace_back(type, name); }

    /// The struct's name as declared (not unique across scopes).
    ustring name() const { return m_name; }

    /// The name with the scope folded in, unique across scopes: "name" in the global scope (0),
    /// "___<scope>_name" otherwise.
    std::string mangled() const;

    int scope() const { return m_scope; }
    int numfields() const { return (int)m_fields.size(); }
    const FieldSpec& field(int i) const { return m_fields[i]; }

    /// The index of the named field, or -1.
    int lookup_field(ustring name) const;

private:
    ustring m_name;
    int m_scope;
    std::vector<FieldSpec> m_fields;
};

// OSL keeps these in its private namespace; code written against that spelling compiles too.
namespace pvt {
using OSL::StructSpec;
using OSL::SymType;
using OSL::TypeSpec;
} // namespace pvt

} // namespace OSL
