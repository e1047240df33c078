// Perlin gradient noise over 1 to 4 dimensions, plain or periodic, evaluated on floats or on
// Dual2<float> so that derivatives follow the same arithmetic as the values.
#pragma once

#include <OSL/dual.h>

namespace OSL::noise {

// Signed Perlin noise (about [-1,1]) at x[0..dims-1], dims in 1..4, for nchan channels (1, or 3
// for vector noise whose channels take successive bytes of each lattice hash). `period` is null
// for aperiodic noise, else dims per-axis periods (floored, at least 1).
template <class T>
void perlin(T* out, int nchan, const T* x, int dims, const float* period);

extern template void perlin<float>(float*, int, const float*, int, const float*);
extern template void perlin<Dual2<float>>(Dual2<float>*, int, const Dual2<float>*, int,
                                          const float*);

} // namespace OSL::noise
