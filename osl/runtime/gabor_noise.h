// Sparse-convolution Gabor noise (random-phase Gabor kernels scattered over a grid of cells),
// optionally filtered against the footprint given by the position's derivatives.
#pragma once

#include <OSL/dual.h>
#include <OSL/oslconfig.h>

namespace OSL {

struct ExecState;
struct Instr;

// The trailing name/value options of noise("gabor", ...).
struct GaborOptions {
    int anisotropic = 0; // 0 isotropic, 1 anisotropic along `direction`, 2 hybrid
    bool doFilter = true;
    Vec3 direction = Vec3(1.0f, 0.0f, 0.0f);
    float bandwidth = 1.0f; // clamped to [0.01, 100]
    float impulses = 16.0f; // clamped to [1, 32]
};

// Gabor noise at p (lower-dimensional positions leave the remaining components at 0), in roughly
// [-1, 1]. With `period` the impulse pattern repeats every floor(period) grid cells per axis
// (axes with a period below 1 repeat every cell). `channels` is 1 for float noise or 3 for
// vector noise, whose components are independent noises; out receives that many values.
void gaborNoise(const Dual2<Vec3>& p, const Vec3* period, const GaborOptions& opt, int channels,
                Dual2<float>* out);

// The noise/pnoise/snoise/psnoise op with the name "gabor" as its first argument: the position
// (1 to 3 dimensions; a trailing 4th dimension is accepted and ignored), the periods for the
// periodic ops, then name/value option pairs. Usable by any kernel that learns the noise name
// only while shading.
void execGaborNoise(ExecState& st, const Instr& in);

} // namespace OSL
