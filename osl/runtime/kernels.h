// Op kernels: each OSO op maps, once per group, to a function chosen for its operand types.
#pragma once

#include "program.h"

#include <string>

namespace OSL {

// Chooses the kernel (and flow kind) of an instruction from its op name and operands. Returns
// false with a message when the op or this combination of operand types is not supported.
bool selectKernel(ShadingSystemImpl& sys, Program& prog, Instr& in, ustring opname,
                  std::string& error);

// Whether `op` reads the derivatives of its argument `arg` whatever its result needs, beyond
// what %argderivs hints say.
bool opTakesDerivs(const ShaderMaster& m, const MasterOp& op, int arg);

} // namespace OSL
