// Cell and hash noise differ only in how a float coordinate becomes a hash key: the floor of
// the coordinate, or its bit pattern. Vector results hash one extra key, the channel index.
#include "noise_cell_hash.h"

#include "noise_hash.h"

#include <OpenImageIO/fmath.h>

#include <cmath>

namespace OSL::noise {

namespace {

inline uint32_t cellKey(float x) {
    return uint32_t(OIIO::ifloor(x));
}

inline float wrapCoord(float s, float period) {
    period = std::floor(period);
    if (period < 1.0f) period = 1.0f;
    return s - period * std::floor(s / period);
}

template <uint32_t (*Key)(float)>
void latticeHash(float* out, int nchan, const float* x, int dims) {
    uint32_t key[5];
    for (int d = 0; d < dims; ++d) key[d] = Key(x[d]);
    if (nchan == 1) {
        out[0] = bitsTo01(hashKeys(key, dims));
        return;
    }
    for (int ch = 0; ch < nchan; ++ch) {
        key[dims] = uint32_t(ch);
        out[ch] = bitsTo01(hashKeys(key, dims + 1));
    }
}

template <uint32_t (*Key)(float)>
void periodicLatticeHash(float* out, int nchan, const float* x, const float* period, int dims) {
    float wrapped[4];
    for (int d = 0; d < dims; ++d) wrapped[d] = wrapCoord(x[d], period[d]);
    latticeHash<Key>(out, nchan, wrapped, dims);
}

} // namespace

void cellNoise(float* out, int nchan, const float* x, int dims) {
    latticeHash<cellKey>(out, nchan, x, dims);
}

void hashNoise(float* out, int nchan, const float* x, int dims) {
    latticeHash<floatBits>(out, nchan, x, dims);
}

void periodicCellNoise(float* out, int nchan, const float* x, const float* period, int dims) {
    periodicLatticeHash<cellKey>(out, nchan, x, period, dims);
}

void periodicHashNoise(float* out, int nchan, const float* x, const float* period, int dims) {
    periodicLatticeHash<floatBits>(out, nchan, x, period, dims);
}

} // namespace OSL::noise
