// Ops and argument forms beyond the basic table: select, periodic noise, lookups with explicit
// derivatives, per-tile texture queries and format without arguments; each output compiles.
#include "hlsl_compile_check.h"
#include "translate_support.h"

#include <gtest/gtest.h>

namespace {

using viewport_test::Contains;
using viewport_test::OSO;
using viewport_test::Translate;
using viewport_test::Translation;

void ExpectCompiles(const std::string& hlsl) {
    if (!viewport_test::GlslangAvailable()) return;
    const auto result = viewport_test::CompileGenerated(hlsl);
    EXPECT_TRUE(result.ok) << result.log;
}

const std::string kInputs = "param\tfloat\ta\t1\nparam\tfloat\tb\t2\nparam\tint\ti\t1\n"
                            "param\tcolor\tc1\t1 1 1\nparam\tpoint\tp1\t4 4 4\n"
                            "param\tstring\tname\t\"cell\"\n"
                            "oparam\tfloat\tr\t0\noparam\tcolor\tc\t0 0 0\n"
                            "global\tpoint\tP\nglobal\tfloat\tu\nglobal\tfloat\tv\n";

Translation Main(const std::string& code, const std::string& declarations = {}) {
    return Translate(OSO(kInputs + declarations, "code ___main___\n" + code + "\tend\n"));
}

TEST(OpTableForms, SelectTakesTheSecondValueWhereTheConditionIsSet) {
    const auto t = Main("\tselect\tr a b i\n\tselect\tc c1 p1 c1\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tr_ = (i_ != 0) ? b_ : a_;\n"));
    // A colour condition selects component by component.
    EXPECT_TRUE(Contains(t.text, "\tc_ = (c1_ != 0) ? p1_ : c1_;\n"));
    ExpectCompiles(t.text);
    EXPECT_FALSE(Main("\tselect\tr a b\n").ok);
}

TEST(OpTableForms, PeriodicNoisePassesItsPeriods) {
    const auto t = Main("\tpsnoise\tr P p1\n"
                        "\tpnoise\tc u v a b\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tr_ = pperlin_1_3(float3(state.position), float3(p1_));\n"));
    EXPECT_TRUE(Contains(t.text, "\tc_ = 0.5 * pperlin_3_2(float2(state.tex_coord[0].x, "
                                 "state.tex_coord[0].y), float2(a_, b_)) + (float3)0.5;\n"))
        << t.text;
    EXPECT_TRUE(Contains(t.text, "include:ksg_noise.h\n"));
    ExpectCompiles(t.text);
}

TEST(OpTableForms, NamedPeriodicNoiseChainsTheTypesThatHaveAPeriodicForm) {
    const auto t = Main("\tpnoise\tr name P p1\n");
    ASSERT_TRUE(t.ok) << t.text;
    const auto h = [](const char* text) { return oslo::HashText(text); };
    const std::string call = "_1_3(float3(state.position), float3(p1_))";
    EXPECT_TRUE(
        Contains(t.text, "\tif(" + h("cell") + " == name_) {r_ = pcellnoise" + call + ";}\n"))
        << t.text;
    EXPECT_TRUE(
        Contains(t.text, "else if(" + h("hash") + " == name_) {r_ = phashnoise" + call + ";}\n"));
    EXPECT_TRUE(Contains(t.text, "else if(" + h("uperlin") + " == name_ || " + h("noise") +
                                     " == name_) {r_ = 0.5 * pperlin" + call +
                                     " + (float1)0.5;}\n"));
    // Simplex noise has no periodic form.
    EXPECT_FALSE(Contains(t.text, "simplex"));
    EXPECT_TRUE(Contains(t.text, "\telse {r_ = 0;}"));
    ExpectCompiles(t.text);
}

TEST(OpTableForms, PeriodicGaborIsApproximated) {
    const auto t = Main("\tpnoise\tr $const1 P p1\n", "const\tstring\t$const1\t\"gabor\"\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_EQ(t.info.messages.at("Gabor noise not supported - will be approximated."), 1);
    EXPECT_EQ(t.info.unsupportedCount, 1);
}

TEST(OpTableForms, EveryPeriodicNoiseFunctionCompiles) {
    // One and four dimensions (position with time), float and colour results, each type.
    const auto t = Main("\tpnoise\tr name u a\n\tpnoise\tc name u v a b\n"
                        "\tpnoise\tr name P u p1 a\n\tpnoise\tc name P u p1 a\n"
                        "\tpnoise\tc name P p1\n\tpnoise\tr name u v a b\n"
                        "\tpsnoise\tr u a\n\tpsnoise\tc P u p1 a\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "pcellnoise_1_1(float1(state.tex_coord[0].x), float1(a_))"));
    EXPECT_TRUE(Contains(t.text, "phashnoise_3_4(float4(state.position, state.tex_coord[0].x), "
                                 "float4(p1_, a_))"));
    ExpectCompiles(t.text);
}

TEST(OpTableForms, PeriodicNoiseWithoutAPeriodIsRejected) {
    const auto t = Main("\tpnoise\tr P\n");
    EXPECT_FALSE(t.ok);
    EXPECT_EQ(t.info.messages.count("Unknown OPcode 'pnoise' - conversion failed."), 1u);
    EXPECT_FALSE(Main("\tpsnoise\tr P p1 a\n").ok);
}

const std::string kTexture = "param\tstring\tTex\t\"a.<UDIM>.png\"\noparam\tcolor\tCout\t0 0 0\n"
                             "oparam\tfloat\tA\t1\nglobal\tfloat\tu\nglobal\tfloat\tv\n"
                             "param\tfloat\tdsdx\t0.01\nparam\tfloat\tdtdy\t0.01\n"
                             "const\tfloat\t$const0\t0\n"
                             "const\tstring\t$const1\t\"alpha\"\n";

TEST(OpTableForms, ExplicitDerivativesSampleWithGradients) {
    const auto t = Translate(
        OSO(kTexture, "code ___main___\n\ttexture\tCout Tex u v dsdx $const0 $const0 dtdy "
                      "$const1 A\n\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "texture_Tex_fetch = texture_Tex.tex.SampleGrad(texture_Tex.smp, "
                                 "float2(state.tex_coord[0].x, state.tex_coord[0].y), "
                                 "float2(dsdx_, 0.00000), float2(0.00000, dtdy_)); \n"))
        << t.text;
    // The options after the derivatives still count.
    EXPECT_TRUE(Contains(t.text, "\t\tA_ = texture_Tex_fetch.a; \n"));
    ExpectCompiles(t.text);
    // Derivatives come in fours.
    EXPECT_FALSE(Translate(OSO(kTexture, "code ___main___\n\ttexture\tCout Tex u v dsdx "
                                         "$const0\n\tend\n"))
                     .ok);
}

TEST(OpTableForms, TextureInfoAtAPositionAsksTheTileThere) {
    oslo::_hlsl_info inputs;
    inputs.udimTiles["Tex"] = {"1001", "1002"};
    const auto t = Translate(OSO(kTexture + "oparam\tint\tok\t0\nlocal\tint[2]\tres\n"
                                            "const\tstring\t$const2\t\"resolution\"\n",
                                 "code ___main___\n\tgettextureinfo\tok Tex u v $const2 res\n"
                                 "\tgettextureinfo\tok Tex u v $const2 res\n\tend\n"),
                             inputs);
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\t{ float4 texture_Tex_tile_info = texture_Tex_info; if "
                                 "(floor(state.tex_coord[0].x) == 1 && floor(state.tex_coord[0].y) "
                                 "== 0) texture_Tex_tile_info = texture_Tex___UDIM1002_info;\n"))
        << t.text;
    EXPECT_TRUE(Contains(t.text, "{ res_[0] = texture_Tex_tile_info.x; res_[1] = "
                                 "texture_Tex_tile_info.y; ok_ = 1; }"));
    EXPECT_TRUE(Contains(t.text, "ksg_sampler2D texture_Tex___UDIM1002"));
    // Two queries in one block each keep their tile size to themselves.
    ExpectCompiles(t.text);
}

TEST(OpTableForms, FormatWithOnlyItsFormatString) {
    const auto t = Translate(OSO("oparam\tstring\ts\t\"\"\nconst\tstring\t$const1\t\"plain\"\n",
                                 "code ___main___\n\tformat\ts $const1\n\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\ts_ = format_0;\n"));
    ExpectCompiles(t.text);
}

} // namespace
