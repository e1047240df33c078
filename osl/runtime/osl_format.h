// OSL's printf/format rules: C conversions applied to each component of triples and matrices
// and to each element of arrays, separated by spaces.
#pragma once

#include "shading_context.h"

#include <string>

namespace OSL {

// Appends the formatted text of fmt with the operands args[0..nargs) to out.
void oslFormat(const ExecState& st, ustring fmt, const Operand* args, int nargs, std::string& out);

// Text of a closure tree as OSL prints it.
void formatClosure(const ClosureColor* c, const ShadingSystemImpl& sys, std::string& out);

} // namespace OSL
