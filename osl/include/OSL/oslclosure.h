// Closures as shaders build them: the tree of weighted components, sums and products that ends in
// Ci, and the parameter descriptions a renderer registers for each closure it knows.
#pragma once

#include <OSL/oslconfig.h>

#include <cstddef>

namespace OSL {

// One parameter of a registered closure: its type, where it lives in the closure's parameter
// record, its keyword (for optional keyword arguments, else null) and its size in bytes. A list of
// them ends with an entry of unknown type whose offset is the record's size and whose field_size
// is the record's alignment.
struct ClosureParam {
    TypeDesc type;
    int offset;
    const char* key;
    int field_size;
};

#define reckless_offsetof(st, fld) (((char*)&(((st*)16)->fld)) - (char*)16)
#define fieldsize(st, fld) sizeof(((st*)0)->fld)

#define CLOSURE_INT_PARAM(st, fld)                                                                 \
    { OSL::TypeDesc::TypeInt, (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld) }
#define CLOSURE_FLOAT_PARAM(st, fld)                                                               \
    { OSL::TypeDesc::TypeFloat, (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld) }
#define CLOSURE_COLOR_PARAM(st, fld)                                                               \
    { OSL::TypeDesc::TypeColor, (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld) }
#define CLOSURE_VECTOR_PARAM(st, fld)                                                              \
    { OSL::TypeDesc::TypeVector, (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld) }
#define CLOSURE_STRING_PARAM(st, fld)                                                              \
    { OSL::TypeDesc::TypeString, (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld) }
#define CLOSURE_CLOSURE_PARAM(st, fld)                                                             \
    { OSL::TypeDesc::PTR, (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld) }

#define CLOSURE_INT_ARRAY_PARAM(st, fld, n)                                                        \
    {                                                                                              \
        OSL::TypeDesc(OSL::TypeDesc::INT, n), (int)reckless_offsetof(st, fld), nullptr,            \
            (int)fieldsize(st, fld)                                                                \
    }
#define CLOSURE_VECTOR_ARRAY_PARAM(st, fld, n)                                                     \
    {                                                                                              \
        OSL::TypeDesc(OSL::TypeDesc::FLOAT, OSL::TypeDesc::VEC3, OSL::TypeDesc::VECTOR, n),        \
            (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld)                      \
    }
#define CLOSURE_COLOR_ARRAY_PARAM(st, fld, n)                                                      \
    {                                                                                              \
        OSL::TypeDesc(OSL::TypeDesc::FLOAT, OSL::TypeDesc::VEC3, OSL::TypeDesc::COLOR, n),         \
            (int)reckless_offsetof(st, fld), nullptr, (int)fieldsize(st, fld)                      \
    }
#define CLOSURE_FLOAT_ARRAY_PARAM(st, fld, n)                                                      \
    {                                                                                              \
        OSL::TypeDesc(OSL::TypeDesc::FLOAT, n), (int)reckless_offsetof(st, fld), nullptr,          \
            (int)fieldsize(st, fld)                                                                \
    }
#define CLOSURE_STRING_ARRAY_PARAM(st, fld, n)                                                     \
    {                                                                                              \
        OSL::TypeDesc(OSL::TypeDesc::STRING, n), (int)reckless_offsetof(st, fld), nullptr,         \
            (int)fieldsize(st, fld)                                                                \
    }

#define CLOSURE_STRING_KEYPARAM(st, fld, key)                                                      \
    { OSL::TypeDesc::TypeString, (int)reckless_offsetof(st, fld), key, (int)fieldsize(st, fld) }
#define CLOSURE_FLOAT_KEYPARAM(st, fld, key)                                                       \
    { OSL::TypeDesc::TypeFloat, (int)reckless_offsetof(st, fld), key, (int)fieldsize(st, fld) }
#define CLOSURE_INT_KEYPARAM(st, fld, key)                                                         \
    { OSL::TypeDesc::TypeInt, (int)reckless_offsetof(st, fld), key, (int)fieldsize(st, fld) }
#define CLOSURE_COLOR_KEYPARAM(st, fld, key)                                                       \
    { OSL::TypeDesc::TypeColor, (int)reckless_offsetof(st, fld), key, (int)fieldsize(st, fld) }
#define CLOSURE_VECTOR_KEYPARAM(st, fld, key)                                                      \
    { OSL::TypeDesc::TypeVector, (int)reckless_offsetof(st, fld), key, (int)fieldsize(st, fld) }

#define CLOSURE_FINISH_PARAM(st)                                                                   \
    { OSL::TypeDesc(), (int)sizeof(st), nullptr, (int)alignof(st) }

struct ClosureComponent;
struct ClosureMul;
struct ClosureAdd;

// The node of a closure tree. Components have ids from COMPONENT_BASE_ID upwards (the id given
// to register_closure); MUL and ADD mark the two kinds of inner node.
struct ClosureColor {
    enum ClosureID { COMPONENT_BASE_ID = 0, MUL = -1, ADD = -2 };

    int id;

    const ClosureComponent* as_comp() const;
    const ClosureMul* as_mul() const;
    const ClosureAdd* as_add() const;
};

// A leaf: the weight follows the id directly, then the closure's parameter record.
struct alignas(16) ClosureComponent : public ClosureColor {
    Vec3 w;

    void* data() { return this + 1; }
    const void* data() const { return this + 1; }
    template <typename T>
    T* as() {
        return reinterpret_cast<T*>(data());
    }
    template <typename T>
    const T* as() const {
        return reinterpret_cast<const T*>(data());
    }
};

// A closure scaled by a colour.
struct ClosureMul : public ClosureColor {
    Color3 weight;
    const ClosureColor* closure;
};

// The sum of two closures.
struct ClosureAdd : public ClosureColor {
    const ClosureColor* closureA;
    const ClosureColor* closureB;
};

inline const ClosureComponent* ClosureColor::as_comp() const {
    return static_cast<const ClosureComponent*>(this);
}
inline const ClosureMul* ClosureColor::as_mul() const {
    return static_cast<const ClosureMul*>(this);
}
inline const ClosureAdd* ClosureColor::as_add() const {
    return static_cast<const ClosureAdd*>(this);
}

} // namespace OSL
