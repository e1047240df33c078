// The op conversion table: the text each op writes, its include bits and messages, and that the
// text compiles against the host's viewport library.
#include "hlsl_compile_check.h"
#include "translate_support.h"

#include <gtest/gtest.h>

namespace {

using viewport_test::Contains;
using viewport_test::Occurrences;
using viewport_test::OSO;
using viewport_test::Translate;
using viewport_test::Translation;

void ExpectCompiles(const std::string& hlsl) {
    if (!viewport_test::GlslangAvailable()) return;
    const auto result = viewport_test::CompileGenerated(hlsl);
    EXPECT_TRUE(result.ok) << result.log;
}

// Translates with what the precompute pass would have supplied: stored expressions per global
// instruction index and the extra inputs that go with them.
Translation TranslateWithPrecomputed(const std::string& oso, std::map<int, std::string> exprs,
                                     std::set<std::pair<std::string, std::string>> inputs,
                                     oslo::_hlsl_info info = {}) {
    Translation t;
    t.info = std::move(info);
    oslo::OSOData data;
    if (!data.parse_memory(oso)) return t;
    oslo::HLSLGenGlobals globals(t.info);
    globals.precomputedExprs = std::move(exprs);
    globals.additionalInputs = std::move(inputs);
    std::string body;
    if (!oslo::GenerateBody(data, body, globals, "F", t.info)) return t;
    const std::string signature = oslo::GenerateSignature(data, "F", globals);
    if (globals.failed) return t;
    t.ok = true;
    t.text.clear();
    const auto includes = oslo::IncludeList(globals);
    if (!includes.empty()) {
        t.text = "/* == ADDITIONAL SETTINGS: \n";
        for (const auto& entry : includes) t.text += entry + "\n";
        t.text += "*/\n";
    }
    t.text += signature + "\n{\n" + body + "\n}\n";
    return t;
}

const std::string kScalars = "param\tfloat\ta\t1\nparam\tfloat\tb\t2\nparam\tint\ti\t1\n"
                             "param\tint\tj\t2\noparam\tfloat\tr\t0\noparam\tint\tk\t0\n"
                             "oparam\tcolor\tc\t0 0 0\noparam\tvector\tw\t0 0 0\n"
                             "param\tcolor\tc1\t1 1 1\nparam\tpoint\tp1\t0 0 0\n"
                             "global\tpoint\tP\nglobal\tfloat\tu\nglobal\tfloat\tv\n"
                             "global\tvector\tI\nglobal\tnormal\tN\n";

Translation Main(const std::string& code, const std::string& declarations = {}) {
    return Translate(OSO(kScalars + declarations, "code ___main___\n" + code + "\tend\n"));
}

TEST(OpTable, UnaryFunctions) {
    const auto t = Main("\ttanh\tr a\n\tlogb\tr a\n\tinversesqrt\tr a\n\tfabs\tr a\n"
                        "\tDy\tr a\n\tDz\tr a\n\tneg\tr a\n\tcompl\tk i\n\terfc\tr a\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tr_ = tanh(a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = floor(log2(a_));\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = rsqrt(a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = abs(a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = -ddy(a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = 0.0;\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = -(a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = ~i_ ;\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = 1.0 - fast_erf(a_);\n"));
    EXPECT_TRUE(Contains(t.text, "include:ksg_util.h\n"));
    ExpectCompiles(t.text);
}

TEST(OpTable, DivisionGuardsByResultType) {
    const auto t = Main("\tdiv\tr a b\n\tdiv\tc c1 a\n\tdiv\tw p1 a\n\tdiv\tk i j\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tr_ = a_ / b_; r_ *= isfinite(r_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tc_ = c1_ / a_; c_ = clamp(c_, (float3)-1e9, (float3)1e9) * "
                                 "any(isfinite(c_));\n"));
    EXPECT_TRUE(
        Contains(t.text, "\tw_ = p1_ / a_; w_ = clamp(w_, (float3)-1e30, (float3)1e30);\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = i_ / j_; \n"));
    ExpectCompiles(t.text);
}

TEST(OpTable, ModuloOfIntsUsesPercent) {
    const auto t = Main("\tmod\tk i j\n\tmod\tr a i\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tk_ = i_ % j_;\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = a_ - i_ * floor(a_ / i_);\n"));
    ExpectCompiles(t.text);
}

TEST(OpTable, BinaryAndFixedForms) {
    const auto t =
        Main("\tadd\tr a b\n\tbitand\tk i j\n\tshl\tk i j\n\tlt\tk a b\n\txor\tk i j\n"
             "\tmin\tr a b\n\tatan2\tr a b\n\tdot\tr c1 p1\n\tcross\tw p1 I\n\tstep\tr a b\n"
             "\tpow\tr a b\n\tcompref\tr c1 i\n\tcompassign\tc i a\n\tmix\tc c1 c a\n"
             "\tsmoothstep\tr a b u\n\tsincos\ta r u\n\tpoint\tw a b u\n\tluminance\tr c1\n"
             "\tcalculatenormal\tw P\n\tarea\tr P\n\tfilterwidth\tr u\n\tbackfacing\tk\n"
             "\tsurfacearea\tr\n\tlength\tr I\n\tdistance\tr P p1\n\tmxcompref\tr m i j\n"
             "\tmxcompassign\tm i j a\n\tassign\tm a\n\tassign\tm i\n\tdeterminant\tr m\n"
             "\ttranspose\tm m\n\tDx\tw P\n\terf\tr u\n\texpm1\tr u\n\twavelength_color\tc u\n"
             "\tblackbody\tc u\n\tsign\tr u\n",
             "local\tmatrix\tm\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tr_ = a_ + b_;\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = i_ & j_;\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = i_ << j_;\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = (a_ < b_) ? 1 : 0;\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = (i_ ^ j_) ? 1 : 0;\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = min(a_, b_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = (b_ < a_?0.0f:1.0f);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = safe_pow(a_, b_);r_ *= isfinite(a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = c1_[i_];\n"));
    EXPECT_TRUE(Contains(t.text, "\tc_[i_] = a_;\n"));
    EXPECT_TRUE(Contains(t.text, "\tc_ = lerp(c1_, c_, a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = smoothstep(a_, max(a_, b_), state.tex_coord[0].x);\n"));
    EXPECT_TRUE(Contains(t.text, "\tsincos(a_, r_, state.tex_coord[0].x);\n"));
    EXPECT_TRUE(Contains(t.text, "\tw_ = float3(a_, b_, state.tex_coord[0].x);\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = m_[i_][j_];\n"));
    EXPECT_TRUE(Contains(t.text, "\tm_[i_][j_] = a_;\n"));
    EXPECT_TRUE(Contains(t.text, "\tm_ = float4x4(a_, 0.0, 0.0, 0.0,  0.0, a_, 0.0, 0.0,  0.0, "
                                 "0.0, a_, 0.0,  0.0, 0.0, 0.0, a_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = (dot(state.normal, state.direction) > 0);\n"));
    EXPECT_TRUE(Contains(t.text, "\tc_ = blackbody_rgb(state.tex_coord[0].x);\n"));
    ExpectCompiles(t.text);
}

TEST(OpTable, NoiseNamesCarryResultAndDomainWidths) {
    const auto t = Main("\tsnoise\tr P\n\tcellnoise\tc u v\n\thashnoise\tr P u\n"
                        "\tcellnoise\tk u\n\tsnoise\tw P u\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tr_ = perlin_1_3(float3(state.position));\n"));
    EXPECT_TRUE(Contains(t.text, "\tc_ = cellnoise_3_2(float2(state.tex_coord[0].x, "
                                 "state.tex_coord[0].y));\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = hashnoise_1_4(float4(state.position, "
                                 "state.tex_coord[0].x));\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = cellnoise_1_1(float1(state.tex_coord[0].x));\n"));
    EXPECT_TRUE(Contains(t.text, "\tw_ = perlin_3_4(float4(state.position, "
                                 "state.tex_coord[0].x));\n"));
    EXPECT_TRUE(Contains(t.text, "include:ksg_noise.h\n"));
    ExpectCompiles(t.text);
}

TEST(OpTable, GaborNoiseIsApproximatedInTheFullChain) {
    const auto t = Main("\tnoise\tr $const1 P\n", "const\tstring\t$const1\t\"gabor\"\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_EQ(t.info.messages.at("Gabor noise not supported - will be approximated."), 1);
    EXPECT_EQ(t.info.unsupportedCount, 1);
    const std::string type = oslo::HashText("gabor") + "/*gabor*/";
    const auto h = [](const char* s) { return oslo::HashText(s); };
    EXPECT_TRUE(Contains(
        t.text, "\tif(" + h("cell") + " == " + type +
                    ") {r_ = cellnoise_1_3(float3(state.position));}\n"
                    "\telse if(" +
                    h("perlin") + " == " + type + " || " + h("snoise") + " == " + type + " || " +
                    h("gabor") + " == " + type +
                    ") {r_ = perlin_1_3(float3(state.position));}\n"
                    "\telse if(" +
                    h("uperlin") + " == " + type + " || " + h("noise") + " == " + type +
                    ") {r_ = 0.5 * perlin_1_3(float3(state.position)) + (float1)0.5;}\n"
                    "\telse if(" +
                    h("hash") + " == " + type +
                    ") {r_ = hashnoise_1_3(float3(state.position));}\n"
                    "\telse if(" +
                    h("simplex") + " == " + type +
                    ") {r_ = simplexnoise_1_3(float3(state.position), 0);}\n"
                    "\telse if(" +
                    h("usimplex") + " == " + type +
                    ") {r_ = 0.5 * simplexnoise_1_3(float3(state.position), 0) + (float1)0.5;}\n"
                    "\telse {r_ = 0;}\n"))
        << t.text;
    ExpectCompiles(t.text);
}

TEST(OpTable, NoiseWithAVariableTypeOrWithoutTypeIsSupported) {
    const auto t = Main("\tnoise\tc name P u\n\tnoise\tr P\n", "param\tstring\tname\t\"perlin\"\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_EQ(t.info.unsupportedCount, 0);
    EXPECT_TRUE(Contains(t.text, "{c_ = cellnoise_3_4(float4(state.position, "
                                 "state.tex_coord[0].x));}"));
    EXPECT_TRUE(Contains(t.text, "(float3)0.5;}"));
    EXPECT_TRUE(
        Contains(t.text, "\tr_ = 0.5 * perlin_1_3(float3(state.position)) + (float1)0.5;\n"));
    ExpectCompiles(t.text);
}

TEST(OpTable, GetAttributeOfUnsupportedNamesFails) {
    for (const char* name : {"paLife", "mtlID"}) {
        const auto t = Main("\tgetattribute\tk $const1 r\n",
                            std::string("const\tstring\t$const1\t\"") + name + "\"\n");
        EXPECT_FALSE(t.ok) << name;
        EXPECT_EQ(t.info.messages.count(std::string("Unsupported attribute '") + name +
                                        "' - conversion failed."),
                  1u);
        EXPECT_EQ(t.info.messages.count("Unknown OPcode 'getattribute' - conversion failed."), 1u);
    }
    const auto matrix =
        Main("\tgetattribute\tk $const1 m\n", "const\tstring\t$const1\t\"x\"\nlocal\tmatrix\tm\n");
    EXPECT_FALSE(matrix.ok);
}

TEST(OpTable, GetAttributeChainsByDestinationType) {
    const auto t =
        Main("\tgetattribute\tk $const1 c\n\tgetattribute\tk $const2 k\n"
             "\tgetattribute\tk $const3 s\n\tgetattribute\tk $const4 r\n"
             "\tgetattribute\tk $const5 w\n",
             "const\tstring\t$const1\t\"wireColor\"\nconst\tstring\t$const2\t\"gBufID\"\n"
             "const\tstring\t$const3\t\"renderer:name\"\nconst\tstring\t$const4\t\"f\"\n"
             "const\tstring\t$const5\t\"UV2\"\nlocal\tstring\ts\n");
    ASSERT_TRUE(t.ok) << t.text;
    const auto h = [](const char* s) { return oslo::HashText(s); };
    const std::string n1 = h("wireColor") + "/*wireColor*/";
    EXPECT_TRUE(Contains(t.text, "\tif(" + h("wireColor") + " == " + n1 +
                                     ") { c_ = objectColor.rgb; k_ = 1; }\n"
                                     "\telse { int4 nameMask = ((int4)objectColorNames == (int4)" +
                                     n1 +
                                     "); if (any(nameMask)) {c_ = mul(nameMask, objectColors).rgb; "
                                     "k_ = 1;} else {k_ = 0;} }\n"));
    const std::string n2 = h("gBufID") + "/*gBufID*/";
    EXPECT_TRUE(Contains(t.text, "\telse if(" + h("osl:version") + " == " + n2 +
                                     ") { k_ = 11213; k_ = 1; }\n\telse if(" +
                                     h("renderer:version") + " == " + n2 +
                                     ") { k_ = 27000; k_ = 1; }\n"
                                     "\telse { int4 nameMask = ((int4)objectIntNames == (int4)" +
                                     n2 +
                                     "); if (any(nameMask)) {k_ = dot((int4)objectInts, "
                                     "nameMask); k_ = 1;} else {k_ = 0;} }\n"));
    EXPECT_TRUE(Contains(t.text, ") { s_ = " + h("trelm:hlsl") + "; k_ = 1; }"));
    EXPECT_TRUE(Contains(t.text, ") { s_ = " + h("TRELM_RELEASE") + "; k_ = 1; }"));
    EXPECT_TRUE(Contains(t.text, "{ int4 nameMask = ((int4)objectColorNames == (int4)" + h("f") +
                                     "/*f*/); if (any(nameMask)) {r_ = "
                                     "dot(objectColors[0], nameMask); k_ = 1;} else "
                                     "{k_ = 0;} }"));
    EXPECT_TRUE(Contains(t.text, "\telse if(" + h("UV2") + " == " + h("UV2") +
                                     "/*UV2*/) { w_ = state.tex_coord[osl_tex_coord_remap[1]]; "
                                     "k_ = 1; }\n"));
    EXPECT_TRUE(Contains(t.text, ", float4 osl_tex_coord_remap, "));
    for (const char* entry : {"nonconsolidatable\n", "predefine:float4 objectColor : WIRECOLOR;\n",
                              "predefine:int objectIds[3] : ITEM_IDS;\n"})
        EXPECT_TRUE(Contains(t.text, entry)) << entry;
    ExpectCompiles(t.text);
}

TEST(OpTable, SpaceOpsCompareWithSpaceHashes) {
    const auto t = Main("\tmatrix\tm $const1 $const2\n\tgetmatrix\tk $const1 $const3 m\n"
                        "\ttransform\tw $const1 $const2 P\n\ttransform\tw m P\n"
                        "\ttransformv\tw $const1 $const3 I\n\ttransformn\tw m N\n"
                        "\traytype\tk $const4\n\tmatrix\tm a a a a a a a a a a a a a a a a\n",
                        "local\tmatrix\tm\nconst\tstring\t$const1\t\"common\"\n"
                        "const\tstring\t$const2\t\"object\"\nconst\tstring\t$const3\t\"camera\"\n"
                        "const\tstring\t$const4\t\"camera\"\n");
    ASSERT_TRUE(t.ok) << t.text;
    const auto h = [](const char* s) { return oslo::HashText(s); };
    const std::string object = h("object") + "/*object*/";
    EXPECT_TRUE(Contains(t.text, "\tif(" + h("object") + " == " + object +
                                     ") {m_ = ksg_matWorldInverse;}\n\telse if(" + h("camera") +
                                     " == " + object + ") {m_ = ksg_matView;}\n"));
    EXPECT_EQ(t.info.messages.at("'matrix(string, string)' only implemented for object space."), 1);
    EXPECT_EQ(t.info.messages.at(
                  "'getmatrix(string, string, matrix)' only implemented for object space."),
              1);
    EXPECT_EQ(t.info.unsupportedCount, 2);
    EXPECT_TRUE(Contains(t.text, "\tw_ = state.position;if(" + h("object") + " == " + object +
                                     ") {w_ = mul(float4(w_, 1.f), ksg_matWorldInverse).xyz;}\n"));
    EXPECT_TRUE(Contains(t.text, "(screenpos_xyzw_tmp.xyz / screenpos_xyzw_tmp.w) * "
                                 "float3(0.5f,-0.5f,1.f) + float3(0.5f,0.5f,0.f)) * "
                                 "float3(__image_x_resolution, __image_y_resolution, 1.f); }"));
    EXPECT_TRUE(Contains(t.text, "\t{ float4 transform_xyzw_tmp = mul( float4(state.position, "
                                 "1.f), m_); w_ = transform_xyzw_tmp.xyz / transform_xyzw_tmp.w; "
                                 "}\n"));
    EXPECT_TRUE(Contains(t.text, "\tw_ = mul(state.normal, (float3x3)m_);\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = ((ksg_matViewInverse[3].xyz == 0.0?" + h("reflection") +
                                     ":" + h("camera") + ") == " + h("camera") +
                                     "/*camera*/) ? 1 : 0;\n\n"));
    EXPECT_TRUE(Contains(t.text, "nonconsolidatable"));
    ExpectCompiles(t.text);
}

TEST(OpTable, CameraSpaceDoesNotDependOnTheObject) {
    const auto t = Main("\ttransformv\tw $const1 $const2 I\n",
                        "const\tstring\t$const1\t\"common\"\nconst\tstring\t$const2\t\"camera\"\n");
    ASSERT_TRUE(t.ok);
    EXPECT_FALSE(Contains(t.text, "nonconsolidatable"));
}

TEST(OpTable, ColorSpacesPickConversionFunctions) {
    const auto t = Main("\tcolor\tc $const1 a b u\n\tcolor\tc $const2 a b u\n\tcolor\tc a b u\n"
                        "\ttransformc\tc $const1 $const3 c1\n",
                        "const\tstring\t$const1\t\"hsv\"\nconst\tstring\t$const2\t\"lab\"\n"
                        "const\tstring\t$const3\t\"XYZ\"\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tc_ = hsv_to_rgb(float3 (a_, b_, state.tex_coord[0].x));\n"));
    EXPECT_TRUE(Contains(t.text, "\tc_ = (float3 (a_, b_, state.tex_coord[0].x));\n"));
    EXPECT_EQ(t.info.messages.at("Unsupported color space 'lab', using 'rgb'"), 1);
    EXPECT_TRUE(Contains(t.text, "\tc_ = rgb_to_XYZ(hsv_to_rgb(c1_));\n"));
    EXPECT_EQ(t.info.unsupportedCount, 1);
    ExpectCompiles(t.text);
}

TEST(OpTable, UnsupportedOpsWriteZeroAndCount) {
    const auto t = Main("\ttrace\tk P I\n\tsetmessage\t$const1 a\n\tnop\n\tclamp\tr a a b\n",
                        "const\tstring\t$const1\t\"name\"\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tk_ = 0;\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = 0;\n"));
    EXPECT_FALSE(Contains(t.text, "/*name*/ = 0"));
    EXPECT_EQ(t.info.unsupportedCount, 4);
    EXPECT_EQ(t.info.messages.at("'nop' function not supported - ignored."), 1);
    ExpectCompiles(t.text);
}

TEST(OpTable, ArrayLengthAndHash) {
    const auto t = Main("\tarraylength\tk arr\n\thash\tk $const1\n",
                        "local\tfloat[3]\tarr\nconst\tstring\t$const1\t\"x\"\n");
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tk_ = 3;\n"));
    EXPECT_TRUE(Contains(t.text, "\tk_ = " + oslo::HashText("x") + "/*x*/;\n"));
    const auto runtime = Main("\tarraylength\tk a\n");
    EXPECT_FALSE(runtime.ok);
    EXPECT_EQ(runtime.info.messages.count("HLSL does not support run-time arraylength()"), 1u);
    EXPECT_FALSE(Main("\thash\tk a\n").ok);
    ExpectCompiles(t.text);
}

const std::string kTexture = "param\tstring\tTex\t\"a.<UDIM>.png\"\noparam\tcolor\tCout\t0 0 0\n"
                             "oparam\tfloat\tA\t1\nglobal\tfloat\tu\nglobal\tfloat\tv\n"
                             "const\tstring\t$const1\t\"alpha\"\n"
                             "const\tstring\t$const2\t\"colorspace\"\n"
                             "const\tstring\t$const3\t\"sRGB\"\n";

TEST(OpTable, TextureTestsEveryUDIMTileButTheFirst) {
    oslo::_hlsl_info info;
    info.udimTiles["Tex"] = {"1001", "1002", "1011"};
    const auto t = TranslateWithPrecomputed(
        OSO(kTexture, "code ___main___\n\ttexture\tCout Tex u v $const1 A\n\tend\n"),
        {{0, "texture_Tex"}},
        {{"ksg_sampler2D", "texture_Tex"},
         {"ksg_sampler2D", "texture_Tex___UDIM1002"},
         {"ksg_sampler2D", "texture_Tex___UDIM1011"},
         {"int", "texture_Tex_alphaMult"}},
        info);
    ASSERT_TRUE(t.ok) << t.text;
    const std::string s = "state.tex_coord[0].x", tt = "state.tex_coord[0].y";
    EXPECT_TRUE(Contains(
        t.text,
        "\t{ float4 texture_Tex_fetch;\n"
        "\t\tif (floor(" +
            s + ") == 1 && floor(" + tt +
            ") == 0)\n"
            "\t\t\ttexture_Tex_fetch = texture_Tex___UDIM1002.tex.SampleLevel("
            "texture_Tex___UDIM1002.smp, float2(" +
            s + ", " + tt +
            "), 0); \n"
            "\t\telse\n"
            "\t\tif (floor(" +
            s + ") == 0 && floor(" + tt +
            ") == 1)\n"
            "\t\t\ttexture_Tex_fetch = texture_Tex___UDIM1011.tex.SampleLevel("
            "texture_Tex___UDIM1011.smp, float2(" +
            s + ", " + tt +
            "), 0); \n"
            "\t\telse\n"
            "\t\ttexture_Tex_fetch = texture_Tex.tex.SampleLevel(texture_Tex.smp, float2(" +
            s + ", " + tt +
            "), 0); \n"
            "\t\tCout_ = texture_Tex_fetch.rgb * (texture_Tex_alphaMult ? texture_Tex_fetch.a : "
            "1.0);\n"
            "\t\tA_ = texture_Tex_fetch.a; \n"
            "\t}\n"))
        << t.text;
    EXPECT_TRUE(Contains(t.text, "void F(int Tex_, ksg_sampler2D texture_Tex, ksg_sampler2D "
                                 "texture_Tex___UDIM1002, ksg_sampler2D texture_Tex___UDIM1011, "
                                 "int texture_Tex_alphaMult, out float3 Cout_, out float A_)"));
    ExpectCompiles(t.text);
}

TEST(OpTable, TextureColorSpaceOnlyWithColorManagement) {
    const std::string oso =
        OSO(kTexture, "code ___main___\n\ttexture\tCout Tex u v $const2 $const3\n\tend\n");
    const std::set<std::pair<std::string, std::string>> inputs = {{"ksg_sampler2D", "texture_Tex"},
                                                                  {"int", "texture_Tex_alphaMult"}};
    const auto off = TranslateWithPrecomputed(oso, {{0, "texture_Tex"}}, inputs);
    ASSERT_TRUE(off.ok);
    EXPECT_FALSE(Contains(off.text, "apply_color_management"));
    ExpectCompiles(off.text);

    oslo::_hlsl_info info;
    info.colorManagement = true;
    info.colorManagementHLSL = {"float4 apply_color_management(float4 inColor, int colorspace)\n"
                                "{\n    return inColor;\n}\n"};
    const auto on = TranslateWithPrecomputed(oso, {{0, "texture_Tex"}}, inputs, info);
    ASSERT_TRUE(on.ok);
    EXPECT_TRUE(
        Contains(on.text, "\t\ttexture_Tex_fetch = apply_color_management(texture_Tex_fetch, " +
                              oslo::HashText("sRGB") + "/*sRGB*/);\n"));
    EXPECT_TRUE(Contains(on.text, "predefine:float4 apply_color_management("));
    ExpectCompiles(on.text);
}

TEST(OpTable, TextureNeedsItsSamplerAndConstantOptionNames) {
    // The precompute pass only looks at the main code, so a lookup in a parameter's default code
    // has no sampler.
    const std::string inDefault = OSO(kTexture + "param\tcolor\tDef\t0 0 0\n",
                                      "code Def\n\ttexture\tDef Tex u v\ncode ___main___\n\tend\n");
    const auto noSampler = Translate(inDefault);
    EXPECT_FALSE(noSampler.ok);
    EXPECT_EQ(noSampler.info.messages.count("Unknown OPcode 'texture' - conversion failed."), 1u);
    const std::string variableOption =
        OSO(kTexture, "code ___main___\n\ttexture\tCout Tex u v Tex A\n\tend\n");
    EXPECT_FALSE(TranslateWithPrecomputed(variableOption, {{0, "texture_Tex"}}, {}).ok);
}

TEST(OpTable, TextureInfoAnswersQueriesThatFitTheDestination) {
    const auto t = TranslateWithPrecomputed(
        OSO(kTexture + "local\tint[2]\tres\nlocal\tint\tch\nlocal\tint\tok\n"
                       "const\tstring\t$const4\t\"resolution\"\n",
            "code ___main___\n\tgettextureinfo\tok Tex $const4 res\n"
            "\tgettextureinfo\tok Tex $const4 ch\n\tend\n"),
        {{0, "texture_Tex"}, {1, "texture_Tex"}}, {{"ksg_sampler2D", "texture_Tex"}});
    ASSERT_TRUE(t.ok) << t.text;
    const std::string n = oslo::HashText("resolution") + "/*resolution*/";
    EXPECT_TRUE(Contains(t.text, "\tif(" + oslo::HashText("resolution") + " == " + n +
                                     ") { res_[0] = texture_Tex_info.x; res_[1] = "
                                     "texture_Tex_info.y; ok_ = 1; }\n\telse { ok_ = 0; }\n"));
    EXPECT_TRUE(Contains(t.text, "\tif(" + oslo::HashText("channels") + " == " + n +
                                     ") { ch_ = 4; ok_ = 1; }\n\telse { ok_ = 0; }\n"));
    ExpectCompiles(t.text);
}

TEST(OpTable, StringOpsReadTheirPrecomputedInput) {
    const std::string oso = OSO("oparam\tint\tn\t0\nparam\tstring\ts\t\"abc\"\n",
                                "code ___main___\n\tstrlen\tn s\n\tend\n");
    const auto t = TranslateWithPrecomputed(oso, {{0, "strlen_0"}}, {{"int", "strlen_0"}});
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tn_ = strlen_0;\n"));
    ExpectCompiles(t.text);
    const auto inDefault = Translate(OSO("oparam\tint\tn\t0\nparam\tstring\ts\t\"abc\"\n"
                                         "param\tint\tm\t0\n",
                                         "code m\n\tstrlen\tm s\ncode ___main___\n\tend\n"));
    EXPECT_FALSE(inDefault.ok);
    EXPECT_EQ(inDefault.info.messages.count("Unknown OPcode 'strlen' - conversion failed."), 1u);
}

} // namespace
