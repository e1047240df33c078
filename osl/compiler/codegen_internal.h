// Small helpers the code generator's files share: the common types, and questions about symbols.
#pragma once

#include "symbols.h"

#include <string>

namespace OSL::pvt {

inline const TypeSpec kInt(TypeDesc::TypeInt);
inline const TypeSpec kFloat(TypeDesc::TypeFloat);
inline const TypeSpec kString(TypeDesc::TypeString);

// The variable a symbol belongs to: through aliases and up from struct fields.
inline const Symbol* rootOf(const Symbol* s) {
    while (s && s->aliasOf) s = s->aliasOf;
    while (s && s->structParent) s = s->structParent;
    return s;
}

inline bool isZeroConst(const Symbol* s) {
    return s->isConst() && ((s->type.is_int() && !s->ivals.empty() && s->ivals[0] == 0) ||
                            (s->type.is_float() && !s->fvals.empty() && s->fvals[0] == 0.f));
}

// The index of component `name` (x y z, or r g b for a colour), or -1.
inline int componentIndex(const TypeSpec& t, const std::string& name) {
    static const char* const xyz[] = {"x", "y", "z"};
    static const char* const rgb[] = {"r", "g", "b"};
    for (int i = 0; i < 3; ++i)
        if (name == (t.is_color() ? rgb[i] : xyz[i])) return i;
    return -1;
}

} // namespace OSL::pvt
