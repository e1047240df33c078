// Run-time checks of the "debug_nan" and "debug_uninit" modes, switched on per program.
#pragma once

#include "shading_context.h"

#include <vector>

namespace OSL {

// Fills every local and temporary of the program's starting heap with a value that marks it as
// not yet written (NaN, the smallest int, a reserved string).
void markUninitialized(Program& prog);

// For each op of a layer, the number the reference shading system reports for it.
std::vector<int> reportedOpNumbers(const ShaderGroup& group, int layer);

// Before an op: reports (and zeroes) marked values among the parts of its arguments it reads.
void checkUninitializedReads(ExecState& st, const Instr& in);

// After an op: reports the first value (or derivative) it wrote that is NaN or infinite.
void checkNonFiniteWrites(ExecState& st, const Instr& in);

} // namespace OSL
