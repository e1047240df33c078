// Cell noise (one random value per unit lattice cell) and hash noise (one per distinct float
// input), plain or periodic, over 1 to 4 coordinates.
#pragma once

namespace OSL::noise {

// Each writes nchan values (1, or 3 for colour/vector results) in [0,1] for x[0..dims-1].
void cellNoise(float* out, int nchan, const float* x, int dims);
void hashNoise(float* out, int nchan, const float* x, int dims);

// Periodic forms: each coordinate is first wrapped into [0, period), the period floored and
// at least 1.
void periodicCellNoise(float* out, int nchan, const float* x, const float* period, int dims);
void periodicHashNoise(float* out, int nchan, const float* x, const float* period, int dims);

} // namespace OSL::noise
