// Simplex noise over 1 to 4 dimensions with its analytic gradient; aperiodic because corners
// are hashed rather than looked up in a permutation table.
#pragma once

namespace OSL::noise {

// Signed simplex noise (about [-1,1]) at x[0..dims-1]; `seed` decorrelates the channels of
// vector noise. When `gradient` is not null it receives the dims partial derivatives.
float simplex(const float* x, int dims, int seed, float* gradient);

} // namespace OSL::noise
