// How the kernel families plug into selectKernel: each family recognises its own ops.
#pragma once

#include "kernels.h"
#include "shading_context.h"
#include "shading_system_impl.h"

namespace OSL {

struct KernelChoice {
    ShadingSystemImpl& sys;
    Program& prog;
    Instr& in;
    ustring op;
    std::string& error;

    const Operand& arg(int i) const { return in.args[i]; }
    int nargs() const { return in.nargs; }
    bool fail(const std::string& why) const {
        error = why;
        return false;
    }
};

// Each returns 1 when it chose a kernel, 0 when the op is not one of its own, -1 on error.
int selectMathKernel(KernelChoice& k);
int selectDataKernel(KernelChoice& k);
int selectStringKernel(KernelChoice& k);
int selectShadingKernel(KernelChoice& k);
int selectNoiseKernel(KernelChoice& k);
int selectGaborKernel(KernelChoice& k);
int selectSplineKernel(KernelChoice& k);
int selectColorKernel(KernelChoice& k);
int selectTextureKernel(KernelChoice& k);
int selectLibraryKernel(KernelChoice& k);

} // namespace OSL
