// Gabor noise: pixels of the conformance cases' reference images recomputed (float and vector
// noise, 1 to 4 dimensions, periodic, filtered), derivatives against finite differences, the
// options, and the noise op through the shading system.
#include "../../../osl/runtime/gabor_noise.h"
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <string>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

using D2 = Dual2<float>;

CorpusImage loadRef(const std::string& caseName, const char* file = "out.tif") {
    return CorpusImage(caseName + "/ref/" + file);
}

int toByte(float v) {
    return int(std::lround(std::clamp(v, 0.0f, 1.0f) * 255.0f));
}

D2 mulD(const D2& a, float b) {
    return a * b;
}

// Expected colour of a pixel, or false where the shader leaves it black.
using PixelFn = std::function<bool(int x, int y, float rgb[3])>;

// Compares every `step`-th pixel with the reference; at most 1% may be off by more than 1/255.
void compareWithRef(const CorpusImage& ref, int step, const PixelFn& fn) {
    ASSERT_TRUE(ref.ok()) << "reference image missing";
    int checked = 0, off = 0;
    for (int y = step / 2; y < ref.height; y += step)
        for (int x = step / 2; x < ref.width; x += step) {
            float rgb[3] = {0, 0, 0};
            if (!fn(x, y, rgb)) continue;
            ++checked;
            for (int c = 0; c < 3; ++c)
                if (std::abs(toByte(rgb[c]) - toByte(ref.at(x, y, c))) > 1) {
                    ++off;
                    break;
                }
        }
    EXPECT_GT(checked, 100);
    EXPECT_LE(off, checked / 100) << off << " of " << checked << " pixels differ";
}

// The coordinates of the testnoise/testpnoise shaders at a pixel of a 512x512 grid whose u and
// v run from 0 to 1 across it, with their screen derivatives.
struct TestCoords {
    float u, v;
    D2 ru, rv, rz;
};
TestCoords testCoords(int x, int y, float angleDeg, float inscale) {
    TestCoords t;
    t.u = float(x) / 511.0f;
    t.v = float(y) / 511.0f;
    const float d = 1.0f / 511.0f;
    const float theta = angleDeg * (float(M_PI) / 180.0f);
    const D2 s(t.u - 0.25f * std::floor(t.u / 0.25f) - 0.125f, d, 0.0f);
    const D2 tt(t.v - 0.5f * std::floor(t.v / 0.5f) - 0.25f, 0.0f, d);
    t.ru = mulD(mulD(s, std::cos(theta)) + mulD(tt, std::sin(theta)), inscale);
    t.rv = mulD(mulD(s, std::sin(theta)) - mulD(tt, std::cos(theta)), inscale);
    t.rz = mulD(s + tt, inscale) / D2(float(M_SQRT2));
    return t;
}

Dual2<Vec3> point3(const D2& x, const D2& y, const D2& z) {
    Dual2<Vec3> p;
    p.val() = Vec3(x.val(), y.val(), z.val());
    p.dx() = Vec3(x.dx(), y.dx(), z.dx());
    p.dy() = Vec3(x.dy(), y.dy(), z.dy());
    return p;
}

// One pixel of testnoise / testpnoise with noisename "gabor".
bool testNoisePixel(int x, int y, bool periodic, float rgb[3]) {
    const TestCoords t = periodic ? testCoords(x, y, 0.0f, 30.0f) : testCoords(x, y, 10.0f, 20.0f);
    int channels;
    if (t.v < 0.49f)
        channels = 1;
    else if (t.v > 0.51f)
        channels = 3;
    else
        return false;
    Dual2<Vec3> p;
    Vec3 period(3.0f, 3.0f, 3.0f);
    if (t.u < 0.24f) {
        p = point3(t.ru, D2(0.0f), D2(0.0f));
        period = Vec3(3.0f, 0.0f, 0.0f);
    } else if (t.u > 0.26f && t.u < 0.49f) {
        p = point3(t.ru, t.rv, D2(0.0f));
        period = Vec3(3.0f, 3.0f, 0.0f);
    } else if ((t.u > 0.51f && t.u < 0.74f) || t.u > 0.76f) {
        p = point3(t.ru, t.rv, t.rz); // the 4th dimension is ignored
    } else {
        return false;
    }
    D2 n[3];
    gaborNoise(p, periodic ? &period : nullptr, GaborOptions(), channels, n);
    for (int c = 0; c < 3; ++c) rgb[c] = 0.5f + 0.5f * n[channels == 3 ? c : 0].val();
    return true;
}

TEST(GaborNoise, MatchesReferenceImageOfFloatAndVectorNoise) {
    compareWithRef(loadRef("noise-gabor"), 5,
                   [](int x, int y, float rgb[3]) { return testNoisePixel(x, y, false, rgb); });
}

TEST(GaborNoise, MatchesReferenceImageOfPeriodicNoise) {
    compareWithRef(loadRef("pnoise-gabor"), 5,
                   [](int x, int y, float rgb[3]) { return testNoisePixel(x, y, true, rgb); });
}

// noise-gabor2d-filter: 2D noise of a position whose frequency grows across the image, so the
// filter has to fade the fine detail out.
TEST(GaborNoise, MatchesReferenceImageOfFilteredNoise) {
    compareWithRef(loadRef("noise-gabor2d-filter"), 5, [](int x, int y, float rgb[3]) {
        const float d = 1.0f / 511.0f;
        const D2 u(float(x) * d, d, 0.0f), v(float(y) * d, 0.0f, d);
        const D2 a = D2(1.0f) + mulD(v, 10.0f) * v;
        const D2 b = D2(1.0f) + mulD(u, 10.0f) * u;
        const D2 px = mulD(u, 5.0f) * a * b, py = mulD(v, 5.0f) * a * b;
        D2 n;
        gaborNoise(point3(px, py, D2(0.0f)), nullptr, GaborOptions(), 1, &n);
        rgb[0] = rgb[1] = rgb[2] = n.val() * 0.5f + 0.5f;
        return true;
    });
}

// Unfiltered noise is smooth except where an impulse crosses its cut-off radius; away from
// those small jumps its derivatives follow its finite differences.
TEST(GaborNoise, DerivativesMatchFiniteDifferences) {
    GaborOptions opt;
    opt.doFilter = false;
    const float h = 1e-3f;
    int compared = 0, jumps = 0;
    for (int i = 0; i < 60; ++i) {
        const Vec3 base(0.37f * float(i), 1.1f + 0.23f * float(i), -0.7f + 0.11f * float(i));
        const Vec3 dir(0.3f, -0.5f, 0.8f);
        Dual2<Vec3> p(base);
        p.dx() = dir;
        D2 n[3], np[3], nm[3];
        gaborNoise(p, nullptr, opt, 3, n);
        gaborNoise(Dual2<Vec3>(base + h * dir), nullptr, opt, 3, np);
        gaborNoise(Dual2<Vec3>(base - h * dir), nullptr, opt, 3, nm);
        for (int c = 0; c < 3; ++c) {
            EXPECT_EQ(n[c].dy(), 0.0f);
            const float forward = (np[c].val() - n[c].val()) / h;
            const float backward = (n[c].val() - nm[c].val()) / h;
            if (std::fabs(forward - backward) > 0.5f) {
                ++jumps;
                continue;
            }
            const float fd = 0.5f * (forward + backward);
            EXPECT_NEAR(n[c].dx(), fd, 0.02f + 0.02f * std::fabs(fd)) << i << " " << c;
            ++compared;
        }
    }
    EXPECT_GE(compared, 150);
    EXPECT_EQ(compared + jumps, 180);
}

TEST(GaborNoise, IsDeterministicBoundedAndCentred) {
    double sum = 0.0, sum2 = 0.0;
    float lo = 1e9f, hi = -1e9f;
    const int n = 2000;
    for (int i = 0; i < n; ++i) {
        const Dual2<Vec3> p(Vec3(0.173f * float(i), 0.071f * float(i % 37), 0.013f * float(i)));
        D2 a, b;
        gaborNoise(p, nullptr, GaborOptions(), 1, &a);
        gaborNoise(p, nullptr, GaborOptions(), 1, &b);
        ASSERT_EQ(a.val(), b.val());
        sum += a.val(), sum2 += double(a.val()) * a.val();
        lo = std::min(lo, a.val()), hi = std::max(hi, a.val());
    }
    EXPECT_NEAR(sum / n, 0.0, 0.05);
    EXPECT_GT(std::sqrt(sum2 / n), 0.05);
    EXPECT_GT(lo, -1.5f);
    EXPECT_LT(hi, 1.5f);
}

TEST(GaborNoise, VectorChannelsAreIndependentAndFirstIsTheFloatNoise) {
    const Dual2<Vec3> p(Vec3(1.3f, 2.7f, -0.4f));
    D2 f, v[3];
    gaborNoise(p, nullptr, GaborOptions(), 1, &f);
    gaborNoise(p, nullptr, GaborOptions(), 3, v);
    EXPECT_EQ(f.val(), v[0].val());
    EXPECT_NE(v[0].val(), v[1].val());
    EXPECT_NE(v[1].val(), v[2].val());
}

TEST(GaborNoise, OptionsChangeTheNoise) {
    const Dual2<Vec3> p(Vec3(0.9f, 2.1f, 0.3f));
    auto at = [&](const GaborOptions& o) {
        D2 r;
        gaborNoise(p, nullptr, o, 1, &r);
        return r.val();
    };
    const GaborOptions base;
    const float v0 = at(base);
    GaborOptions o = base;
    o.anisotropic = 1;
    EXPECT_NE(at(o), v0);
    o.direction = Vec3(0.0f, 3.0f, 0.0f);
    const float aniso = at(o);
    o.anisotropic = 2;
    EXPECT_NE(at(o), aniso);
    o = base;
    o.bandwidth = 3.0f;
    EXPECT_NE(at(o), v0);
    o.bandwidth = 1000.0f; // clamped to 100
    const float big = at(o);
    o.bandwidth = 100.0f;
    EXPECT_EQ(at(o), big);
    o = base;
    o.impulses = 4.0f;
    EXPECT_NE(at(o), v0);
    o.impulses = 0.0f; // clamped to 1
    const float few = at(o);
    o.impulses = 1.0f;
    EXPECT_EQ(at(o), few);
}

// Anisotropic noise along x varies along x and hardly along y.
TEST(GaborNoise, AnisotropicNoiseFollowsItsDirection) {
    GaborOptions o;
    o.anisotropic = 1;
    o.doFilter = false;
    o.direction = Vec3(4.0f, 0.0f, 0.0f);
    double alongX = 0.0, alongY = 0.0;
    for (int i = 0; i < 200; ++i) {
        const Vec3 b(0.31f * float(i), 0.17f * float(i), 0.5f);
        D2 n0, nx, ny;
        gaborNoise(Dual2<Vec3>(b), nullptr, o, 1, &n0);
        gaborNoise(Dual2<Vec3>(b + Vec3(0.05f, 0, 0)), nullptr, o, 1, &nx);
        gaborNoise(Dual2<Vec3>(b + Vec3(0, 0.05f, 0)), nullptr, o, 1, &ny);
        alongX += std::fabs(nx.val() - n0.val());
        alongY += std::fabs(ny.val() - n0.val());
    }
    EXPECT_GT(alongX, 3.0 * alongY);
}

TEST(GaborNoise, FilteringFadesDetailSmallerThanThePixel) {
    // A footprint much wider than the noise's features averages them away.
    double filtered = 0.0, unfiltered = 0.0;
    GaborOptions off;
    off.doFilter = false;
    for (int i = 0; i < 100; ++i) {
        Dual2<Vec3> p(Vec3(0.37f * float(i), 0.19f * float(i), 0.0f));
        p.dx() = Vec3(8.0f, 0.0f, 0.0f);
        p.dy() = Vec3(0.0f, 8.0f, 0.0f);
        D2 a, b;
        gaborNoise(p, nullptr, GaborOptions(), 1, &a);
        gaborNoise(p, nullptr, off, 1, &b);
        filtered += std::fabs(a.val()), unfiltered += std::fabs(b.val());
    }
    EXPECT_LT(filtered, 0.2 * unfiltered);
}

TEST(GaborNoise, PeriodicNoiseRepeatsOverWholeCells) {
    // Periods count grid cells; the noise repeats where the cell pattern does, every
    // period * cell size in each axis, cell size being the noise's kernel radius.
    GaborOptions o;
    o.doFilter = false;
    const float a = 2.0f * (1.0f / 3.0f) * 2.128934f; // kernel width for bandwidth 1
    const float cell = std::sqrt(-std::log(0.02f) / float(M_PI)) / a;
    const Vec3 period(4.0f, 3.0f, 2.0f);
    for (int i = 0; i < 20; ++i) {
        const Vec3 p(0.41f * float(i), 0.29f * float(i), 0.13f * float(i));
        D2 n0, n1;
        gaborNoise(Dual2<Vec3>(p), &period, o, 1, &n0);
        gaborNoise(Dual2<Vec3>(p + Vec3(4.0f * cell, 3.0f * cell, 2.0f * cell)), &period, o, 1,
                   &n1);
        EXPECT_NEAR(n0.val(), n1.val(), 2e-4f) << i;
    }
}

// ---- the op, through the shading system -----------------------------------------------------

// out = noise("gabor", u * 10, v * 10, options...); col = pnoise("gabor", P * 4, period).
const char* kGaborOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader gabortest
param	int	aniso	0		%read{2,2} %write{2147483647,-1}
param	float	bw	1		%read{2,2} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{2,2}
oparam	color	col	0 0 0		%read{2147483647,-1} %write{4,4}
global	float	u	%read{0,0} %write{2147483647,-1}
global	float	v	%read{1,1} %write{2147483647,-1}
global	point	P	%read{3,3} %write{2147483647,-1}
temp	float	$tmp1	%read{2,2} %write{0,0}
temp	float	$tmp2	%read{2,2} %write{1,1}
temp	point	$tmp3	%read{4,4} %write{3,3}
const	float	$const1	10		%read{0,1} %write{2147483647,-1}
const	string	$const2	"gabor"		%read{2,4} %write{2147483647,-1}
const	string	$const3	"anisotropic"		%read{2,2} %write{2147483647,-1}
const	string	$const4	"bandwidth"		%read{2,2} %write{2147483647,-1}
const	string	$const5	"do_filter"		%read{2,2} %write{2147483647,-1}
const	int	$const6	0		%read{2,2} %write{2147483647,-1}
const	float	$const7	4		%read{3,3} %write{2147483647,-1}
const	point	$const8	5 5 5		%read{4,4} %write{2147483647,-1}
code ___main___
	mul		$tmp1 u $const1 	%argrw{"wrr"}
	mul		$tmp2 v $const1 	%argrw{"wrr"}
	noise		out $const2 $tmp1 $tmp2 $const3 aniso $const4 bw $const5 $const6 	%argrw{"wrrrrrrrrr"}
	mul		$tmp3 P $const7 	%argrw{"wrr"}
	pnoise		col $const2 $tmp3 $const8 	%argrw{"wrrr"}
	end
)";

class GaborOpTest : public ShadingFixture {
protected:
    GaborOpTest() : ShadingFixture({{"gabortest", kGaborOso}}) {}

    // The floats of `symbol` after shading `g` once at (u, v).
    const float* run(ShaderGroup& g, const char* symbol, float u, float v) {
        EXPECT_TRUE(execute(g, u, v));
        return value<float>(g, symbol);
    }
    ShaderGroupRef group(int aniso, float bw) {
        return single("gabortest", {{"aniso", TypeInt, &aniso}, {"bw", TypeFloat, &bw}});
    }
};

TEST_F(GaborOpTest, OpMatchesTheLibraryWithItsOptions) {
    for (int aniso : {0, 1, 2}) {
        ShaderGroupRef g = group(aniso, 2.0f);
        const float u = 0.31f, v = 0.77f;
        const float* out = run(*g, "out", u, v);
        ASSERT_NE(out, nullptr);
        GaborOptions o;
        o.anisotropic = aniso;
        o.bandwidth = 2.0f;
        o.doFilter = false;
        D2 want;
        gaborNoise(Dual2<Vec3>(Vec3(u * 10.0f, v * 10.0f, 0.0f)), nullptr, o, 1, &want);
        EXPECT_EQ(*out, want.val()) << aniso;
    }
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
}

TEST_F(GaborOpTest, PeriodicColourNoiseUsesThePositionsFootprint) {
    ShaderGroupRef g = group(0, 1.0f);
    const float* col = run(*g, "col", 0.4f, 0.6f);
    ASSERT_NE(col, nullptr);
    // globalsAt gives P = (u, v, 1) with dP/dx = (0.1, 0, 0), dP/dy = (0, 0.1, 0).
    Dual2<Vec3> p(Vec3(1.6f, 2.4f, 4.0f));
    p.dx() = Vec3(0.4f, 0.0f, 0.0f);
    p.dy() = Vec3(0.0f, 0.4f, 0.0f);
    const Vec3 period(5.0f);
    D2 want[3];
    gaborNoise(p, &period, GaborOptions(), 3, want);
    for (int c = 0; c < 3; ++c) EXPECT_EQ(col[c], want[c].val()) << c;
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
}

} // namespace
