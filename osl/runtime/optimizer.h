// The group-time optimiser: once a group's program is built, proves which symbols hold the same
// value at every sample, evaluates the ops computing them once, drops work nobody observes and
// lets identical layers run once.
#pragma once

#include "program.h"

#include <cstdint>
#include <vector>

namespace OSL {

class ShadingSystemImpl;

// What the optimiser did to one program, for statistics and tests.
struct OptimizerStats {
    int folded = 0;       // ops evaluated at build time
    int removed = 0;      // ops no longer executed (folded, dead or no-ops)
    int mergedLayers = 0; // layers whose work another identical layer does
    // Per layer, per op of its shader: 1 for ops in a branch that a fixed condition never takes.
    // Empty when there are none.
    std::vector<std::vector<uint8_t>> neverRun;
};

// Optimises a program whose kernels are chosen, before it is first executed. Options come from
// the system's "optimize" and "opt_*" attributes; with optimize=0 the program is left as built.
// Warnings asked for with opt_warnings go to the system's error handler.
void optimizeProgram(ShadingSystemImpl& sys, const ShaderGroup& group, Program& prog,
                     OptimizerStats& stats);

// Lets a layer identical to an earlier one (same shader, values and inputs) hand out the
// earlier layer's results instead of running itself.
int mergeInstances(ShadingSystemImpl& sys, const ShaderGroup& group, Program& prog);

} // namespace OSL
