// Noise: noise, snoise, pnoise, psnoise, cellnoise, hashnoise and the generic noise("type", ...)
// forms.
#include "kernels_registry.h"

namespace OSL {

int selectNoiseKernel(KernelChoice&) {
    return 0;
}

} // namespace OSL
