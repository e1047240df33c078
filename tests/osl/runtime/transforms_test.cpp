// Coordinate-space and colour-space transforms whose spaces are fixed when the group is built:
// one space to itself leaves the value as it is, without asking the renderer, while the same
// spaces given per point still go through the lookup (and its errors).
#include "../../../osl/runtime/transforms.h"
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <memory>
#include <vector>

using namespace OSL;
using namespace runtime_test;

namespace {

// Pout = transform(fromspace, tospace, point(1, 2, 3)).
const char* kTransformOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader xform
param	string	fromspace	"common"		%read{0,0} %write{2147483647,-1}
param	string	tospace	"common"		%read{0,0} %write{2147483647,-1}
oparam	point	Pout	0 0 0		%read{2147483647,-1} %write{0,0}
const	point	$const1	1 2 3		%read{0,0} %write{2147483647,-1}
code ___main___
	transform		Pout fromspace tospace $const1 	%argrw{"wrrr"}
	end
)";

// Cout = transformc(fromspace, tospace, c).
const char* kTransformcOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader xformc
param	string	fromspace	"rgb"		%read{0,0} %write{2147483647,-1}
param	string	tospace	"rgb"		%read{0,0} %write{2147483647,-1}
param	color	c	1 0.5 0.25		%read{0,0} %write{2147483647,-1}
oparam	color	Cout	0 0 0		%read{2147483647,-1} %write{0,0}
code ___main___
	transformc		Cout fromspace tospace c 	%argrw{"wrrr"}
	end
)";

// Knows only "myspace" (a scale by 2 in y), like a renderer with no camera of its own.
class MySpaceRenderer final : public RendererServices {
public:
    bool get_matrix(ShaderGlobals*, Matrix44& m, ustring from, float) override {
        if (from != "myspace") return false;
        m = Matrix44();
        m.scale(Vec3(1.0f, 2.0f, 1.0f));
        return true;
    }
};

class FixedSpacesTest : public ShadingFixture {
protected:
    FixedSpacesTest()
        : ShadingFixture({{"xform", kTransformOso}, {"xformc", kTransformcOso}},
                         std::make_unique<MySpaceRenderer>()) {}

    // Runs `shader` with the two spaces set (fixed unless `perPoint`) and returns `out`.
    Vec3 run(const char* shader, const char* out, const char* from, const char* to,
             bool perPoint = false, const Vec3* color = nullptr) {
        const ustring f(from), t(to);
        std::vector<Param> params = {{"fromspace", TypeString, &f, !perPoint},
                                     {"tospace", TypeString, &t, !perPoint}};
        if (color) params.push_back({"c", TypeColor, color});
        ShaderGroupRef g = single(shader, params);
        return ShadingFixture::run<Vec3>(*g, out);
    }
};

TEST_F(FixedSpacesTest, FixedUnknownSpaceToItselfIsTheIdentityWithoutError) {
    EXPECT_EQ(run("xform", "Pout", "camera", "camera"), Vec3(1.0f, 2.0f, 3.0f));
    EXPECT_EQ(handler.errors, "");
    // "world" is another name of common space.
    EXPECT_EQ(run("xform", "Pout", "world", "common"), Vec3(1.0f, 2.0f, 3.0f));
    EXPECT_EQ(handler.errors, "");
}

TEST_F(FixedSpacesTest, SameUnknownSpaceGivenPerPointIsStillLookedUp) {
    EXPECT_EQ(run("xform", "Pout", "camera", "camera", true), Vec3(1.0f, 2.0f, 3.0f));
    EXPECT_NE(handler.errors.find("Unknown transformation \"camera\""), std::string::npos)
        << handler.errors;
}

TEST_F(FixedSpacesTest, DifferentFixedSpacesStillTransform) {
    EXPECT_EQ(run("xform", "Pout", "myspace", "common"), Vec3(1.0f, 4.0f, 3.0f));
    EXPECT_EQ(run("xform", "Pout", "common", "myspace"), Vec3(1.0f, 1.0f, 3.0f));
    EXPECT_EQ(handler.errors, "");
    run("xform", "Pout", "camera", "common");
    EXPECT_NE(handler.errors.find("Unknown transformation \"camera\""), std::string::npos);
}

TEST_F(FixedSpacesTest, FixedColorSpaceToItselfKeepsAHueOfOne) {
    // Through RGB, a hue of 1 comes back as 0; a fixed hsv -> hsv leaves it alone.
    const Vec3 hsv(1.0f, 0.5f, 1.0f / 3.0f);
    EXPECT_EQ(run("xformc", "Cout", "hsv", "hsv", false, &hsv), hsv);
    const Vec3 roundTrip = run("xformc", "Cout", "hsv", "hsv", true, &hsv);
    EXPECT_FLOAT_EQ(roundTrip.x, 0.0f);
    EXPECT_NEAR(roundTrip.y, 0.5f, 1e-6f);
    EXPECT_NEAR(roundTrip.z, 1.0f / 3.0f, 1e-6f);
    EXPECT_EQ(handler.errors, "");
}

TEST_F(FixedSpacesTest, EveryNameOfRgbIsOneSpace) {
    const Vec3 c(0.25f, 0.5f, 2.0f);
    EXPECT_EQ(run("xformc", "Cout", "RGB", "linear", false, &c), c);
    // Fixed but different spaces still convert.
    const Vec3 hsv = run("xformc", "Cout", "rgb", "hsv", false, &c);
    EXPECT_NEAR(hsv.x, 0.666667f - 0.25f / (6.0f * 1.75f), 1e-5f);
    EXPECT_NEAR(hsv.y, 0.875f, 1e-6f);
    EXPECT_FLOAT_EQ(hsv.z, 2.0f);
}

TEST(TransformDual, PointDerivativesFollowTheDivisionByW) {
    // w = x + 1: the point (1, 0, 0) lands at x = 1/2, and d/dx of x / (x + 1) is 1/4.
    Matrix44 m;
    m[0][3] = 1.0f;
    Dual2<Vec3> p(Vec3(1.0f, 0.0f, 0.0f), Vec3(1.0f, 0.0f, 0.0f), Vec3(0.0f, 2.0f, 0.0f));
    const Dual2<Vec3> r = transformDual(m, p, 0);
    EXPECT_FLOAT_EQ(r.val().x, 0.5f);
    EXPECT_FLOAT_EQ(r.dx().x, 0.25f);
    EXPECT_FLOAT_EQ(r.dy().y, 1.0f); // y / w with w = 2
    // The same matrix moves vectors without the projective part.
    const Dual2<Vec3> v = transformDual(m, p, 1);
    EXPECT_EQ(v.val(), Vec3(1.0f, 0.0f, 0.0f));
    EXPECT_EQ(v.dx(), Vec3(1.0f, 0.0f, 0.0f));
    // A point sent to infinity comes out as the origin, derivatives included.
    const Dual2<Vec3> q(Vec3(-1.0f, 3.0f, 0.0f), Vec3(1.0f), Vec3(1.0f));
    const Dual2<Vec3> z = transformDual(m, q, 0);
    EXPECT_EQ(z.val(), Vec3(0.0f));
    EXPECT_EQ(z.dx(), Vec3(0.0f));
}

} // namespace
