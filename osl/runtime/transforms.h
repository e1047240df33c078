// Named coordinate systems (through the renderer services).
#pragma once

#include "shading_context.h"

#include <OSL/dual.h>

namespace OSL {

// The matrix from `space` to common (toCommon) or from common to `space`; identity and false
// when the renderer does not know the space.
bool getSpaceMatrix(ExecState& st, ustring space, Matrix44& m, bool toCommon);

// Transforms a value with derivatives as a point (0), vector (1) or normal (2).
Dual2<Vec3> transformDual(const Matrix44& m, const Dual2<Vec3>& v, int kind);

} // namespace OSL
