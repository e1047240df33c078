// Named coordinate systems (through the renderer services).
#pragma once

#include "shading_context.h"

#include <OSL/dual.h>

namespace OSL {

// The matrix from `space` to common (toCommon) or from common to `space`; identity and false
// when the renderer does not know the space.
bool getSpaceMatrix(ExecState& st, ustring space, Matrix44& m, bool toCommon);

// Whether `from` and `to` are constant strings naming the same space ("world" and "common"
// being one), so that a transform between them leaves its value as it is.
bool sameFixedSpace(const Program& prog, const Operand& from, const Operand& to);

// transform between one space and itself: the value and its derivatives pass unchanged, with
// no lookup of the space (so no error for a space the renderer does not know).
void kTransformIdentity(ExecState& st, const Instr& in);

// Transforms a value with derivatives as a point (0), vector (1) or normal (2).
Dual2<Vec3> transformDual(const Matrix44& m, const Dual2<Vec3>& v, int kind);

} // namespace OSL
