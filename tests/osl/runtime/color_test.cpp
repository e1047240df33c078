// The colour system against values the reference printed in the conformance corpus: RGB<->XYZ in
// Rec709 and ACEScg, blackbody, spectral colours, the built-in spaces and their derivatives.
#include "../../../osl/runtime/color_system.h"

#include <OpenImageIO/imagebuf.h>

#include <gtest/gtest.h>

#include <cmath>
#include <string>

using namespace OSL;

namespace {

// The corpus prints 6 significant digits (%g); allow for the last one.
void expectNear6(const Vec3& got, const Vec3& want) {
    for (int c = 0; c < 3; ++c)
        EXPECT_NEAR(got[c], want[c], std::max(2e-6f, std::fabs(want[c]) * 2e-6f))
            << "component " << c << " of (" << got.x << ' ' << got.y << ' ' << got.z << ')';
}

const ColorSystem& rec709() {
    return *ColorSystem::find("Rec709");
}

Vec3 convert(const ColorSystem& cs, const char* from, const char* to, const Vec3& c) {
    Vec3 out(-99.0f);
    EXPECT_TRUE(cs.transform(ustring(from), ustring(to), c, out)) << from << " -> " << to;
    return out;
}

} // namespace

TEST(ColorSystem, EveryNamedSystemExistsAndUnknownNamesDoNot) {
    for (const char* name : {"Rec709", "sRGB", "NTSC", "EBU", "PAL", "SECAM", "SMPTE", "HDTV",
                             "CIE", "AdobeRGB", "XYZ", "ACES2065-1", "ACEScg"}) {
        const ColorSystem* cs = ColorSystem::find(name);
        ASSERT_NE(cs, nullptr) << name;
        EXPECT_EQ(cs->name(), name);
        // The white point has luminance one: the weights sum to one.
        const Vec3 w = cs->luminanceWeights();
        EXPECT_NEAR(w.x + w.y + w.z, 1.0f, 1e-5f) << name;
    }
    EXPECT_EQ(ColorSystem::find("rec709"), nullptr);
    EXPECT_EQ(ColorSystem::find(""), nullptr);
    EXPECT_EQ(&ColorSystem::findOrDefault("no such system"), &rec709());
}

TEST(ColorSystem, XyzSystemIsTheIdentity) {
    const ColorSystem& xyz = *ColorSystem::find("XYZ");
    expectNear6(xyz.rgbToXyz(Vec3(0.1f, 0.7f, 0.2f)), Vec3(0.1f, 0.7f, 0.2f));
}

TEST(ColorSystem, Rec709MatchesReferenceOutputs) {
    // color ("XYZ", 0.25, 0.5, 0.25) and luminance (0.5 0.75 0.75) from the "color" case.
    Vec3 rgb;
    ASSERT_TRUE(rec709().toRgb(ustring("XYZ"), Vec3(0.25f, 0.5f, 0.25f), rgb));
    EXPECT_NEAR(rgb.x, -0.0831534f, 2e-6f);
    EXPECT_NEAR(rgb.y, 0.705882f, 2e-6f);
    EXPECT_NEAR(rgb.z, 0.176283f, 2e-6f);
    EXPECT_NEAR(rec709().luminance(Vec3(0.5f, 0.75f, 0.75f)), 0.696873f, 2e-6f);
    EXPECT_FLOAT_EQ(rec709().luminance(Vec3(0.5f)), 0.5f);
    ASSERT_TRUE(rec709().toRgb(ustring("hsv"), Vec3(0.1f, 0.2f, 0.5f), rgb));
    expectNear6(rgb, Vec3(0.5f, 0.46f, 0.4f));
    ASSERT_TRUE(rec709().toRgb(ustring("YIQ"), Vec3(0.5f, 0.25f, 0.25f), rgb));
    expectNear6(rgb, Vec3(0.8939f, 0.270375f, 0.649225f));
    ASSERT_TRUE(rec709().toRgb(ustring("hsl"), Vec3(0.5f, 1.0f, 0.1f), rgb));
    expectNear6(rgb, Vec3(0.0f, 0.2f, 0.2f));
}

TEST(ColorSystem, AcesCgMatchesReferenceOutputs) {
    // The "colorspace" case runs with -colorspace ACEScg.
    const ColorSystem& cg = *ColorSystem::find("ACEScg");
    expectNear6(convert(cg, "RGB", "XYZ", Vec3(0.1f, 0.7f, 0.2f)),
                Vec3(0.191286f, 0.509818f, 0.204353f));
    expectNear6(cg.blackbody(1500.0f), Vec3(75.0559f, 22.3461f, 2.22219f));
    expectNear6(cg.wavelengthColor(500.0f), Vec3(0.0f, 0.207563f, 0.105645f));
}

TEST(ColorSystem, TransformcCaseValues) {
    // Three decimals, as the "transformc" case prints them.
    auto near3 = [](const Vec3& got, const Vec3& want) {
        for (int c = 0; c < 3; ++c) EXPECT_NEAR(got[c], want[c], 0.0005f) << c;
    };
    const Vec3 c(0.5f, 1.0f, 0.0f);
    near3(convert(rec709(), "rgb", "hsv", c), Vec3(0.25f, 1.0f, 1.0f));
    near3(convert(rec709(), "rgb", "hsl", c), Vec3(0.25f, 1.0f, 0.5f));
    near3(convert(rec709(), "rgb", "YIQ", c), Vec3(0.737f, 0.023f, -0.417f));
    near3(convert(rec709(), "rgb", "XYZ", c), Vec3(0.564f, 0.822f, 0.129f));
    near3(convert(rec709(), "rgb", "xyY", c), Vec3(0.372f, 0.543f, 0.822f));
    near3(convert(rec709(), "rgb", "xyY", Vec3(0.5f)), Vec3(0.313f, 0.329f, 0.5f));
    near3(convert(rec709(), "linear", "sRGB", c), Vec3(0.735f, 1.0f, 0.0f));
    near3(convert(rec709(), "sRGB", "linear", c), Vec3(0.214f, 1.0f, 0.0f));
}

TEST(ColorSystem, RoundTripsThroughEverySpace) {
    const Vec3 colours[] = {Vec3(0.5f, 1.0f, 0.0f), Vec3(0.2f, 0.3f, 0.9f), Vec3(0.7f, 0.1f, 0.4f),
                            Vec3(0.25f)};
    for (const char* space : {"hsv", "hsl", "YIQ", "XYZ", "xyY", "sRGB", "RGB", "Rec709"})
        for (const Vec3& c : colours) {
            const Vec3 back = convert(rec709(), space, "rgb", convert(rec709(), "rgb", space, c));
            for (int k = 0; k < 3; ++k) EXPECT_NEAR(back[k], c[k], 2e-5f) << space;
        }
}

TEST(ColorSystem, DerivativesFollowTheConversion) {
    // transformc ("rgb", "YIQ"/"sRGB") of (0.5 0.5 0.5) with d/dx = (1,0,0), d/dy = (0,1,0).
    const DColor c(Vec3(0.5f), Vec3(1.0f, 0.0f, 0.0f), Vec3(0.0f, 1.0f, 0.0f));
    DColor yiq;
    ASSERT_TRUE(rec709().transform(ustring("rgb"), ustring("YIQ"), c, yiq));
    EXPECT_NEAR(yiq.dx().x, 0.299f, 1e-6f);
    EXPECT_NEAR(yiq.dx().y, 0.596f, 1e-6f);
    EXPECT_NEAR(yiq.dy().z, -0.523f, 1e-6f);
    DColor srgb;
    ASSERT_TRUE(rec709().transform(ustring("rgb"), ustring("sRGB"), c, srgb));
    EXPECT_NEAR(srgb.val().x, 0.735f, 0.0005f);
    EXPECT_NEAR(srgb.dx().x, 0.659f, 0.0005f);
    EXPECT_EQ(srgb.dx().y, 0.0f);
    EXPECT_NEAR(srgb.dy().y, 0.659f, 0.0005f);
    // Every other space: derivatives against central differences.
    const Vec3 base(0.3f, 0.6f, 0.2f), dir(0.01f, -0.02f, 0.015f);
    for (const char* space : {"hsv", "hsl", "XYZ", "xyY"}) {
        DColor out;
        ASSERT_TRUE(
            rec709().transform(ustring("rgb"), ustring(space), DColor(base, dir, Vec3(0.0f)), out));
        const float h = 1e-3f;
        const Vec3 plus = convert(rec709(), "rgb", space, base + dir * h);
        const Vec3 minus = convert(rec709(), "rgb", space, base - dir * h);
        const Vec3 fd = (plus - minus) / (2.0f * h);
        for (int k = 0; k < 3; ++k) EXPECT_NEAR(out.dx()[k], fd[k], 2e-3f) << space << ' ' << k;
    }
    EXPECT_NEAR(rec709().luminance(c).dx(), rec709().luminanceWeights().x, 1e-7f);
}

TEST(ColorSystem, UnknownSpacesAreNotConvertedHere) {
    Vec3 out(7.0f);
    EXPECT_FALSE(rec709().transform(ustring("Cineon"), ustring("rgb"), Vec3(0.5f), out));
    EXPECT_FALSE(rec709().transform(ustring("rgb"), ustring("bogus"), Vec3(0.5f), out));
    EXPECT_EQ(out, Vec3(7.0f));
    EXPECT_FALSE(rec709().isBuiltin(ustring("ACEScg")));
    EXPECT_TRUE(ColorSystem::find("ACEScg")->isBuiltin(ustring("ACEScg")));
    // The constructor form leaves linear and sRGB to the external configuration.
    EXPECT_FALSE(rec709().toRgb(ustring("sRGB"), Vec3(0.5f), out));
}

TEST(ColorSystem, BlackbodyIsContinuousAndDimBelowDraper) {
    const ColorSystem& cs = rec709();
    EXPECT_EQ(cs.blackbody(500.0f), Vec3(1.0e-6f, 0.0f, 0.0f));
    // The table (below 12000K) and the direct integration agree where they meet.
    const Vec3 below = cs.blackbody(11999.0f), above = cs.blackbody(12001.0f);
    for (int c = 0; c < 3; ++c) EXPECT_NEAR(below[c], above[c], above[c] * 0.005f) << c;
    // Hotter bodies are brighter and bluer.
    const Vec3 warm = cs.blackbody(2000.0f), hot = cs.blackbody(9000.0f);
    EXPECT_GT(hot.z / hot.x, warm.z / warm.x);
    EXPECT_GT(cs.luminance(hot), cs.luminance(warm));
}

TEST(ColorSystem, WavelengthColorMatchesReferenceImage) {
    // The wavelength_color case shades a 1000x64 grid (u = x / 999, no pixel centring) with
    // lambda = 1000 u.
    OIIO::ImageBuf ref(std::string(TESSEL_SHARED_DIR) +
                       "/osl-conformance/testsuite/wavelength_color/ref/out.exr");
    ASSERT_TRUE(ref.read(0, 0, true, OIIO::TypeFloat)) << ref.geterror();
    ASSERT_EQ(ref.spec().width, 1000);
    const ColorSystem& cs = rec709();
    for (int x = 0; x < 1000; x += 7) {
        const float u = float(x) / 999.0f;
        const Vec3 got = cs.wavelengthColor(1000.0f * u);
        float px[3];
        ref.getpixel(x, 10, px, 3);
        for (int c = 0; c < 3; ++c) EXPECT_NEAR(got[c], px[c], 1e-5f) << "x " << x << " c " << c;
    }
    EXPECT_EQ(cs.wavelengthColor(370.0f), Vec3(0.0f));
    EXPECT_EQ(cs.wavelengthColor(781.0f), Vec3(0.0f));
}
