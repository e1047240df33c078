// The noise family: values against the reference images of the conformance corpus, derivatives
// against finite differences, and the noise ops as shaders see them (names, errors, derivs).
#include "../../../osl/runtime/noise_cell_hash.h"
#include "../../../osl/runtime/noise_perlin.h"
#include "../../../osl/runtime/noise_simplex.h"
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

using D2 = Dual2<float>;

using RefImage = CorpusImage;

// The shading language's mod: the result takes the sign of the divisor.
float oslMod(float a, float b) {
    return a - b * std::floor(a / b);
}

// Coordinates the corpus' noise shaders derive from (u, v) of one pixel.
struct ShaderCoords {
    float u, v, ru, rv, rz, ttime;
};

ShaderCoords coordsAt(int px, int py, int res, float angleDeg, float inscale, bool timeFromS) {
    ShaderCoords c;
    // The shading grid puts u = 0 and u = 1 on the first and last pixels.
    c.u = float(px) / float(res - 1);
    c.v = float(py) / float(res - 1);
    const float theta = angleDeg * float(M_PI / 180.0);
    const float s = oslMod(c.u, 0.25f) - 0.125f;
    const float t = oslMod(c.v, 0.5f) - 0.25f;
    c.ru = std::cos(theta) * s + std::sin(theta) * t;
    c.rv = std::sin(theta) * s - std::cos(theta) * t;
    c.ru *= inscale;
    c.rv *= inscale;
    c.rz = (inscale * (s + t)) / float(M_SQRT2);
    c.ttime = timeFromS ? s * inscale : c.u * inscale;
    return c;
}

// Which noise form the shaders use in a pixel's quadrant: dims 1-4 across u, float or colour
// across v; 0 in the gaps between quadrants.
int dimsAt(const ShaderCoords& c) {
    if (c.u < 0.24f) return 1;
    if (c.u > 0.26f && c.u < 0.49f) return 2;
    if (c.u > 0.51f && c.u < 0.74f) return 3;
    if (c.u > 0.76f) return 4;
    return 0;
}
int channelsAt(const ShaderCoords& c) {
    if (c.v < 0.49f) return 1;
    if (c.v > 0.51f) return 3;
    return 0;
}

void coordsForDims(const ShaderCoords& c, int dims, float* x) {
    if (dims <= 2) {
        x[0] = c.ru, x[1] = c.rv;
    } else {
        x[0] = c.ru, x[1] = c.rv, x[2] = c.rz, x[3] = c.ttime;
    }
}

// Samples a grid of pixels; `eval` writes the noise (nchan values) for given coords and dims
// and returns false to skip a pixel. Counts pixels whose 8-bit value differs by more than
// `tolerance` of the full range.
template <class Eval>
int countMismatches(const RefImage& ref, float angle, float inscale, bool timeFromS,
                    float tolerance, int& checked, Eval eval) {
    int bad = 0;
    checked = 0;
    for (int py = 3; py < ref.height; py += 13)
        for (int px = 5; px < ref.width; px += 11) {
            const ShaderCoords c = coordsAt(px, py, ref.width, angle, inscale, timeFromS);
            const int dims = dimsAt(c), nchan = channelsAt(c);
            if (!dims || !nchan) continue;
            float x[4], r[3];
            coordsForDims(c, dims, x);
            if (!eval(r, nchan, x, dims)) continue;
            ++checked;
            for (int ch = 0; ch < 3; ++ch) {
                const float expected = ref.at(px, py, ch);
                const float got = std::min(1.0f, std::max(0.0f, r[nchan == 3 ? ch : 0]));
                if (std::fabs(got - expected) > tolerance) {
                    ++bad;
                    ADD_FAILURE() << "pixel " << px << "," << py << " dims " << dims << " ch " << ch
                                  << ": " << got << " vs reference " << expected;
                    break;
                }
            }
        }
    return bad;
}

constexpr float kQuantum = 1.0f / 255.0f;

TEST(NoiseReference, PeriodicPerlinMatchesCorpusImage) {
    RefImage ref("pnoise/ref/out.tif");
    ASSERT_TRUE(ref.ok());
    int checked = 0;
    const int bad = countMismatches(ref, 0.0f, 40.0f, false, kQuantum + 1e-4f, checked,
                                    [](float* r, int nchan, const float* x, int dims) {
                                        const float period[4] = {3, 3, 3, 3};
                                        noise::perlin(r, nchan, x, dims, period);
                                        for (int c = 0; c < nchan; ++c) r[c] = 0.5f * (r[c] + 1.0f);
                                        return true;
                                    });
    EXPECT_GT(checked, 1000);
    EXPECT_EQ(bad, 0);
}

TEST(NoiseReference, CellNoiseMatchesCorpusImage) {
    RefImage ref("noise-cell/ref/out.tif");
    ASSERT_TRUE(ref.ok());
    int checked = 0;
    const int bad = countMismatches(ref, 10.0f, 20.0f, true, 0.5f * kQuantum + 1e-4f, checked,
                                    [](float* r, int nchan, const float* x, int dims) {
                                        // Skip points within rounding of a cell boundary.
                                        for (int d = 0; d < dims; ++d)
                                            if (std::fabs(x[d] - std::round(x[d])) < 1e-3f)
                                                return false;
                                        noise::cellNoise(r, nchan, x, dims);
                                        return true;
                                    });
    EXPECT_GT(checked, 1000);
    EXPECT_EQ(bad, 0);
}

TEST(NoiseReference, SimplexMatchesCorpusImage) {
    RefImage ref("noise-simplex/ref/out.tif");
    ASSERT_TRUE(ref.ok());
    int checked = 0;
    const int bad = countMismatches(ref, 10.0f, 20.0f, true, kQuantum + 1e-4f, checked,
                                    [](float* r, int nchan, const float* x, int dims) {
                                        for (int c = 0; c < nchan; ++c)
                                            r[c] =
                                                0.5f + 0.5f * noise::simplex(x, dims, c, nullptr);
                                        return true;
                                    });
    EXPECT_GT(checked, 1000);
    EXPECT_EQ(bad, 0);
}

// ---- derivatives -------------------------------------------------------------------------------

// Seeds x with d/dx along axis `ax` and d/dy along axis `ay`.
void seed(D2* xd, const float* x, int dims, int ax, int ay) {
    for (int d = 0; d < dims; ++d) xd[d] = D2(x[d], d == ax ? 1.0f : 0.0f, d == ay ? 1.0f : 0.0f);
}

float centralDifference(const float* x, int dims, int axis, int nchan, int ch,
                        const float* period) {
    const float h = 1e-3f;
    float a[4], b[4], ra[3], rb[3];
    for (int d = 0; d < dims; ++d) a[d] = b[d] = x[d];
    a[axis] -= h, b[axis] += h;
    noise::perlin(ra, nchan, a, dims, period);
    noise::perlin(rb, nchan, b, dims, period);
    return (rb[ch] - ra[ch]) / (2 * h);
}

TEST(NoiseDerivatives, PerlinDualsFollowFiniteDifferences) {
    const float points[][4] = {
        {0.3f, 1.7f, -2.45f, 0.61f}, {-5.2f, 3.33f, 7.9f, -1.15f}, {12.71f, -0.42f, 0.18f, 4.4f}};
    const float period[4] = {4, 5, 3, 7};
    for (const float* p : points)
        for (int dims = 1; dims <= 4; ++dims)
            for (int nchan : {1, 3})
                for (const float* per : {static_cast<const float*>(nullptr), period})
                    for (int ax = 0; ax < dims; ++ax) {
                        const int ay = (ax + 1) % dims;
                        D2 xd[4], rd[3];
                        seed(xd, p, dims, ax, ay);
                        noise::perlin(rd, nchan, xd, dims, per);
                        for (int ch = 0; ch < nchan; ++ch) {
                            const float fdx = centralDifference(p, dims, ax, nchan, ch, per);
                            const float fdy = centralDifference(p, dims, ay, nchan, ch, per);
                            EXPECT_NEAR(rd[ch].dx(), fdx, 2e-2f + 2e-2f * std::fabs(fdx))
                                << "dims " << dims << " axis " << ax;
                            if (ay != ax) {
                                EXPECT_NEAR(rd[ch].dy(), fdy, 2e-2f + 2e-2f * std::fabs(fdy))
                                    << "dims " << dims << " axis " << ay;
                            }
                        }
                    }
}

TEST(NoiseDerivatives, DualValuesEqualPlainValuesBelowFourDimensions) {
    const float p[4] = {1.37f, -4.21f, 0.77f, 2.5f};
    for (int dims = 1; dims <= 4; ++dims) {
        float r[3];
        D2 xd[4], rd[3];
        seed(xd, p, dims, 0, 0);
        noise::perlin(r, 3, p, dims, nullptr);
        noise::perlin(rd, 3, xd, dims, nullptr);
        for (int ch = 0; ch < 3; ++ch) {
            // 4D blends its corners in another order with derivatives, as the reference does.
            if (dims < 4) {
                EXPECT_EQ(rd[ch].val(), r[ch]) << "dims " << dims;
            } else {
                EXPECT_NEAR(rd[ch].val(), r[ch], 1e-6f);
            }
        }
    }
}

TEST(NoiseDerivatives, SimplexGradientFollowsFiniteDifferences) {
    const float points[][4] = {{0.3f, 1.7f, -2.45f, 0.61f}, {-5.2f, 3.33f, 7.9f, -1.15f}};
    const float h = 1e-3f;
    for (const float* p : points)
        for (int dims = 1; dims <= 4; ++dims)
            for (int seedValue = 0; seedValue < 3; ++seedValue) {
                float g[4];
                const float v = noise::simplex(p, dims, seedValue, g);
                EXPECT_EQ(v, noise::simplex(p, dims, seedValue, nullptr));
                for (int a = 0; a < dims; ++a) {
                    float lo[4], hi[4];
                    for (int d = 0; d < dims; ++d) lo[d] = hi[d] = p[d];
                    lo[a] -= h, hi[a] += h;
                    const float fd = (noise::simplex(hi, dims, seedValue, nullptr) -
                                      noise::simplex(lo, dims, seedValue, nullptr)) /
                                     (2 * h);
                    EXPECT_NEAR(g[a], fd, 2e-2f + 2e-2f * std::fabs(fd))
                        << "dims " << dims << " axis " << a;
                }
            }
}

// ---- lattice noises -----------------------------------------------------------------------------

TEST(NoiseLattice, CellNoiseIsConstantWithinACellAndWrapsWithItsPeriod) {
    float a[3], b[3], c[3];
    const float x0[3] = {2.1f, -3.9f, 5.5f}, x1[3] = {2.9f, -3.05f, 5.01f};
    noise::cellNoise(a, 3, x0, 3);
    noise::cellNoise(b, 3, x1, 3);
    for (int ch = 0; ch < 3; ++ch) EXPECT_EQ(a[ch], b[ch]);
    EXPECT_NE(a[0], a[1]);
    const float moved[3] = {3.1f, -3.9f, 5.5f};
    noise::cellNoise(c, 3, moved, 3);
    EXPECT_NE(a[0], c[0]);

    const float period[3] = {4.7f, 2.0f, 0.3f}; // floored: 4, 2, and at least 1
    const float shifted[3] = {x0[0] + 8.0f, x0[1] - 2.0f, x0[2] + 1.0f};
    noise::periodicCellNoise(a, 1, x0, period, 3);
    noise::periodicCellNoise(b, 1, shifted, period, 3);
    EXPECT_EQ(a[0], b[0]);
}

TEST(NoiseLattice, HashNoiseSeparatesNeighbouringFloats) {
    const float x = 0.25f;
    const float next = std::nextafter(x, 1.0f);
    float a, b, c[3];
    noise::hashNoise(&a, 1, &x, 1);
    noise::hashNoise(&b, 1, &next, 1);
    EXPECT_NE(a, b);
    noise::hashNoise(c, 3, &x, 1);
    EXPECT_NE(c[0], c[1]);
    EXPECT_NE(c[1], c[2]);
    for (float v : {a, b, c[0], c[1], c[2]}) {
        EXPECT_GE(v, 0.0f);
        EXPECT_LE(v, 1.0f);
    }
    const float p = 3.0f, wrapped = x + 3.0f;
    noise::periodicHashNoise(&a, 1, &x, &p, 1);
    noise::periodicHashNoise(&b, 1, &wrapped, &p, 1);
    EXPECT_EQ(a, b);
}

TEST(NoisePerlin, PeriodicNoiseRepeatsAndStaysInRange) {
    const float period[4] = {3, 5, 2, 4};
    const float p[4] = {0.37f, 1.91f, -0.6f, 2.2f};
    for (int dims = 1; dims <= 4; ++dims) {
        float q[4], a[3], b[3];
        for (int d = 0; d < dims; ++d) q[d] = p[d] + period[d] * (d % 2 ? -2.0f : 1.0f);
        noise::perlin(a, 3, p, dims, period);
        noise::perlin(b, 3, q, dims, period);
        for (int ch = 0; ch < 3; ++ch) {
            EXPECT_NEAR(a[ch], b[ch], 1e-5f) << "dims " << dims;
            EXPECT_LE(std::fabs(a[ch]), 1.05f);
        }
    }
    // At lattice points gradient noise vanishes.
    const float lattice[4] = {2, -7, 3, 11};
    for (int dims = 1; dims <= 4; ++dims) {
        float r[3];
        noise::perlin(r, 3, lattice, dims, nullptr);
        for (float v : r) EXPECT_EQ(v, 0.0f);
    }
}

// ---- through the shading system ----------------------------------------------------------------

// byname = noise(kind, P); direct = snoise(P); cell = cellnoise(P); dn = Dx(noise("uperlin", P));
// dcell = Dx(cellnoise(P)); per = pnoise(P, point(2)); opt = noise("perlin", P, "bandwidth", 2).
const char* kNoiseOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader noisy
param	string	kind	"perlin"		%read{0,0} %write{2147483647,-1}
oparam	float	byname	0		%read{2147483647,-1} %write{0,0}
oparam	float	direct	0		%read{2147483647,-1} %write{1,1}
oparam	color	cell	0 0 0		%read{2147483647,-1} %write{2,2}
oparam	float	dn	0		%read{2147483647,-1} %write{4,4}
oparam	float	dcell	0		%read{2147483647,-1} %write{6,6}
oparam	float	per	0		%read{2147483647,-1} %write{7,7}
oparam	float	opt	0		%read{2147483647,-1} %write{8,8}
global	point	P	%read{0,8} %write{2147483647,-1} %derivs
local	float	n	%read{4,4} %write{3,3} %derivs
local	float	c	%read{6,6} %write{5,5} %derivs
const	string	$const1	"uperlin"		%read{3,3} %write{2147483647,-1}
const	point	$const2	2 2 2		%read{7,7} %write{2147483647,-1}
const	string	$const3	"perlin"		%read{8,8} %write{2147483647,-1}
const	string	$const4	"bandwidth"		%read{8,8} %write{2147483647,-1}
const	float	$const5	2		%read{8,8} %write{2147483647,-1}
code ___main___
	noise		byname kind P 	%argrw{"wrr"}
	snoise		direct P 	%argrw{"wr"}
	cellnoise	cell P 	%argrw{"wr"}
	noise		n $const1 P 	%argrw{"wrr"}	%argderivs{2}
	Dx		dn n 	%argrw{"wr"} %argderivs{1}
	cellnoise	c P 	%argrw{"wr"}
	Dx		dcell c 	%argrw{"wr"} %argderivs{1}
	pnoise		per P $const2 	%argrw{"wrr"}
	noise		opt $const3 P $const4 $const5 	%argrw{"wrrrr"}
	end
)";

const char* kBadNameOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader badname
oparam	float	out	0		%read{2147483647,-1} %write{0,0}
global	point	P	%read{0,0} %write{2147483647,-1}
const	string	$const1	"bogus"		%read{0,0} %write{2147483647,-1}
code ___main___
	noise		out $const1 P 	%argrw{"wrr"}
	end
)";

class NoiseShadingTest : public ShadingFixture {
protected:
    NoiseShadingTest() : ShadingFixture({{"noisy", kNoiseOso}, {"badname", kBadNameOso}}) {}

    // A group of `shader`, with the noise named `kind` when one is given.
    ShaderGroupRef group(const char* shader, const char* kind = nullptr) {
        const ustring k(kind ? kind : "");
        return single(shader, kind ? std::vector<Param>{{"kind", TypeDesc::STRING, &k}}
                                   : std::vector<Param>{});
    }
};

TEST_F(NoiseShadingTest, OpsAgreeWithTheNoiseFunctions) {
    ShaderGroupRef g = group("noisy");
    const float u = 0.37f, v = 0.81f;
    ASSERT_TRUE(execute(*g, u, v));
    const float p[3] = {u, v, 1.0f};
    float signedPerlin, cell[3], periodic;
    noise::perlin(&signedPerlin, 1, p, 3, nullptr);
    noise::cellNoise(cell, 3, p, 3);
    const float period[3] = {2, 2, 2};
    noise::perlin(&periodic, 1, p, 3, period);
    EXPECT_EQ(*value<float>(*g, "byname"), signedPerlin);
    EXPECT_EQ(*value<float>(*g, "direct"), signedPerlin);
    EXPECT_EQ(*value<float>(*g, "opt"), signedPerlin);
    EXPECT_EQ(*value<float>(*g, "per"), 0.5f * (periodic + 1.0f));
    for (int c = 0; c < 3; ++c) EXPECT_EQ(value<float>(*g, "cell")[c], cell[c]);
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
}

TEST_F(NoiseShadingTest, DerivativesFlowThroughNoiseButNotCellNoise) {
    ShaderGroupRef g = group("noisy");
    const float u = 0.37f, v = 0.81f;
    ASSERT_TRUE(execute(*g, u, v));
    // P moves by (0.1, 0, 0) per pixel in x.
    float lo, hi;
    const float h = 1e-3f;
    const float a[3] = {u - h, v, 1.0f}, b[3] = {u + h, v, 1.0f};
    noise::perlin(&lo, 1, a, 3, nullptr);
    noise::perlin(&hi, 1, b, 3, nullptr);
    const float expected = 0.1f * 0.5f * (hi - lo) / (2 * h);
    EXPECT_NEAR(*value<float>(*g, "dn"), expected, 1e-3f + 1e-2f * std::fabs(expected));
    EXPECT_NE(*value<float>(*g, "dn"), 0.0f);
    EXPECT_EQ(*value<float>(*g, "dcell"), 0.0f);
}

TEST_F(NoiseShadingTest, NameChosenWhileShadingSelectsEachType) {
    const float u = 0.61f, v = 0.23f;
    const float p[3] = {u, v, 1.0f};
    float perlin, cell, hash, simplex;
    noise::perlin(&perlin, 1, p, 3, nullptr);
    noise::cellNoise(&cell, 1, p, 3);
    noise::hashNoise(&hash, 1, p, 3);
    simplex = noise::simplex(p, 3, 0, nullptr);
    const std::pair<const char*, float> cases[] = {
        {"snoise", perlin},   {"uperlin", 0.5f * (perlin + 1.0f)},  {"cell", cell}, {"hash", hash},
        {"simplex", simplex}, {"usimplex", 0.5f * (simplex + 1.0f)}};
    for (const auto& [kind, expected] : cases) {
        ShaderGroupRef g = group("noisy", kind);
        ASSERT_TRUE(execute(*g, u, v));
        EXPECT_EQ(*value<float>(*g, "byname"), expected) << kind;
    }
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
}

TEST_F(NoiseShadingTest, UnknownNameWhileShadingIsReportedAndGivesZero) {
    ShaderGroupRef g = group("noisy", "wobbly");
    execute(*g, 0.5f, 0.5f);
    EXPECT_NE(handler.errors.find("Unknown noise type \"wobbly\""), std::string::npos)
        << handler.errors;
    EXPECT_EQ(*value<float>(*g, "byname"), 0.0f);
}

TEST_F(NoiseShadingTest, UnknownConstantNameFailsTheGroup) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ss.Shader(*g, "surface", "badname", "layer");
    ss.ShaderGroupEnd(*g);
    EXPECT_FALSE(execute(*g, 0.5f, 0.5f));
    EXPECT_NE(handler.errors.find("noise type \"bogus\" is unknown"), std::string::npos)
        << handler.errors;
}

} // namespace
