// Precompute functions: which instructions the backward slice keeps, the extra inputs they
// declare, and what a run computes from parameter values.
#include "hlsl_compile_check.h"
#include "translate_support.h"

#include <viewport/precompute_function.h>

#include <gtest/gtest.h>

#include <climits>

namespace {

using viewport_test::Contains;
using viewport_test::OSO;

struct Built {
    bool ok = false;
    std::string text;
    oslo::_hlsl_info info;
};

// Translates under a name of its own, so that each test has its own precompute function.
Built Build(const std::string& name, const std::string& declarations, const std::string& code,
            oslo::_hlsl_info inputs = {}) {
    Built b;
    b.info = std::move(inputs);
    b.ok = oslo::GenerateHLSL(name, OSO(declarations, "code ___main___\n" + code + "\tend\n"),
                              b.info, &b.text);
    return b;
}

// A callback that gives string parameters the texts and int parameters the values listed.
oslo::PrecomputeParameterCallback Parameters(std::map<std::string, std::string> texts,
                                             std::map<std::string, int> ints = {}) {
    return [texts, ints](const std::string& name, oslo::PrecomputeVal& slot) {
        if (texts.count(name)) slot.str = oslo::WidenText(texts.at(name));
        if (ints.count(name)) slot.value = ints.at(name);
    };
}

void ExpectCompiles(const std::string& hlsl) {
    if (!viewport_test::GlslangAvailable()) return;
    const auto result = viewport_test::CompileGenerated(hlsl);
    EXPECT_TRUE(result.ok) << result.log;
}

const std::string kTextureShader = "param\tstring\tTex\t\"default.png\"\n"
                                   "oparam\tcolor\tCout\t0 0 0\n"
                                   "global\tfloat\tu\nglobal\tfloat\tv\n";

TEST(PrecomputeFunction, ATextureParameterBecomesASamplerWithItsAlphaInput) {
    const auto b = Build("pc_param", kTextureShader, "\ttexture\tCout Tex u v\n");
    ASSERT_TRUE(b.ok) << b.text;
    EXPECT_TRUE(Contains(b.text, "void pc_param(int Tex_, ksg_sampler2D texture_Tex, int "
                                 "texture_Tex_alphaMult, out float3 Cout_)"))
        << b.text;
    EXPECT_TRUE(Contains(b.text, "Cout_ = texture_Tex_fetch.rgb * (texture_Tex_alphaMult ? "));
    ExpectCompiles(b.text);

    const auto results = oslo::RunPrecomputeFunction("pc_param", Parameters({{"Tex", "a.png"}}));
    ASSERT_EQ(results.count("texture_Tex"), 1u);
    EXPECT_EQ(results.at("texture_Tex").str, L"a.png");
    // Without a value from the map the parameter keeps its declared default.
    const auto defaults = oslo::RunPrecomputeFunction("pc_param", Parameters({}));
    EXPECT_EQ(defaults.at("texture_Tex").str, L"default.png");
}

TEST(PrecomputeFunction, UDIMTilesAddASamplerEach) {
    oslo::_hlsl_info inputs;
    inputs.udimTiles["Tex"] = {"1001", "1002"};
    const auto b = Build("pc_udim", kTextureShader, "\ttexture\tCout Tex u v\n", inputs);
    ASSERT_TRUE(b.ok) << b.text;
    EXPECT_TRUE(Contains(b.text, "ksg_sampler2D texture_Tex, ksg_sampler2D texture_Tex___UDIM1002, "
                                 "int texture_Tex_alphaMult"))
        << b.text;
    ExpectCompiles(b.text);
}

TEST(PrecomputeFunction, TheBranchNotTakenIsSkipped) {
    // if (Which) name = "a.png"; else name = "b.png"; Cout = texture(name, u, v);
    const std::string declarations = kTextureShader + "param\tint\tWhich\t0\nlocal\tstring\tname\n"
                                                      "const\tstring\t$const1\t\"a.png\"\n"
                                                      "const\tstring\t$const2\t\"b.png\"\n";
    const std::string code = "\tif\tWhich 2 3\n"
                             "\tassign\tname $const1\n"
                             "\tassign\tname $const2\n"
                             "\ttexture\tCout name u v\n";
    const auto b = Build("pc_if", declarations, code);
    ASSERT_TRUE(b.ok) << b.text;
    EXPECT_TRUE(Contains(b.text, "ksg_sampler2D texture_name,")) << b.text;
    ExpectCompiles(b.text);

    const auto one = oslo::RunPrecomputeFunction("pc_if", Parameters({}, {{"Which", 1}}));
    ASSERT_EQ(one.count("texture_name"), 1u);
    EXPECT_EQ(one.at("texture_name").str, L"a.png");
    const auto zero = oslo::RunPrecomputeFunction("pc_if", Parameters({}, {{"Which", 0}}));
    EXPECT_EQ(zero.at("texture_name").str, L"b.png");
}

TEST(PrecomputeFunction, LookupsOfAReassignedVariableGetSamplersOfTheirOwn) {
    const std::string declarations = kTextureShader + "oparam\tcolor\tC2\t0 0 0\n"
                                                      "local\tstring\tname\n"
                                                      "const\tstring\t$const1\t\"a.png\"\n"
                                                      "const\tstring\t$const2\t\"b.png\"\n";
    const std::string code = "\tassign\tname $const1\n"
                             "\ttexture\tCout name u v\n"
                             "\tassign\tname $const2\n"
                             "\ttexture\tC2 name u v\n";
    const auto b = Build("pc_reassigned", declarations, code);
    ASSERT_TRUE(b.ok) << b.text;
    // The earlier lookup is named after the assignment that the later file comes from.
    EXPECT_TRUE(Contains(b.text, "Cout_ = texture_name_2_fetch.rgb")) << b.text;
    EXPECT_TRUE(Contains(b.text, "C2_ = texture_name_fetch.rgb"));
    ExpectCompiles(b.text);
    const auto r = oslo::RunPrecomputeFunction("pc_reassigned", Parameters({}));
    EXPECT_EQ(r.at("texture_name_2").str, L"a.png");
    EXPECT_EQ(r.at("texture_name").str, L"b.png");
}

TEST(PrecomputeFunction, InstructionsThatFeedNoLookupStayOut) {
    // The arithmetic on k feeds nothing that the CPU must know, so no function is stored.
    const auto b = Build("pc_none", "param\tint\tk\t1\noparam\tint\tr\t0\n", "\tadd\tr k k\n");
    ASSERT_TRUE(b.ok) << b.text;
    EXPECT_FALSE(oslo::HasPrecomputeFunction("pc_none"));
    EXPECT_TRUE(oslo::RunPrecomputeFunction("pc_none", Parameters({})).empty());
    EXPECT_TRUE(oslo::RunPrecomputeFunction("no such shader", Parameters({})).empty());
}

TEST(PrecomputeFunction, StringOpsBecomeIntInputsComputedOnTheCPU) {
    const std::string declarations =
        "param\tstring\tS\t\"wood\"\nparam\tint\tN\t7\n"
        "oparam\tint\tlen\t0\noparam\tint\tends\t0\noparam\tint\tjoined\t0\n"
        "oparam\tint\tpart\t0\noparam\tint\ttext\t0\n"
        "const\tstring\t$const1\t\"od\"\nconst\tstring\t$const2\t\"_grain\"\n"
        "const\tint\t$const3\t1\nconst\tint\t$const4\t2\n"
        "const\tstring\t$const5\t\"%s_%03d.%s\"\nconst\tstring\t$const6\t\"tx\"\n";
    const std::string code = "\tstrlen\tlen S\n"
                             "\tendswith\tends S $const1\n"
                             "\tconcat\tjoined S $const2\n"
                             "\tsubstr\tpart S $const3 $const4\n"
                             "\tformat\ttext $const5 S N $const6\n";
    const auto b = Build("pc_strings", declarations, code);
    ASSERT_TRUE(b.ok) << b.text;
    for (const char* line :
         {"\tlen_ = strlen_0;\n", "\tends_ = endswith_1;\n", "\tjoined_ = concat_2;\n",
          "\tpart_ = substr_3;\n", "\ttext_ = format_4;\n"})
        EXPECT_TRUE(Contains(b.text, line)) << line << b.text;
    EXPECT_TRUE(Contains(b.text, "int concat_2, int endswith_1, int format_4, int strlen_0, "
                                 "int substr_3, out int len_"))
        << b.text;
    ExpectCompiles(b.text);

    const auto r =
        oslo::RunPrecomputeFunction("pc_strings", Parameters({{"S", "marble"}}, {{"N", 42}}));
    EXPECT_EQ(r.at("strlen_0").value, 6);
    EXPECT_EQ(r.at("endswith_1").value, 0);
    EXPECT_EQ(r.at("concat_2").str, L"marble_grain");
    EXPECT_EQ(r.at("concat_2").value, oslo::StringHash("marble_grain"));
    EXPECT_EQ(r.at("substr_3").str, L"ar");
    EXPECT_EQ(r.at("format_4").str, L"marble_042.tx");
    EXPECT_EQ(r.at("format_4").value, oslo::StringHash("marble_042.tx"));

    const auto wood = oslo::RunPrecomputeFunction("pc_strings", Parameters({}));
    EXPECT_EQ(wood.at("endswith_1").value, 1);
    EXPECT_EQ(wood.at("format_4").str, L"wood_007.tx");
}

TEST(PrecomputeFunction, AStringOpResultCanNameTheTexture) {
    const std::string declarations = kTextureShader + "param\tint\tFrame\t1\nlocal\tstring\tfile\n"
                                                      "const\tstring\t$const1\t\"frame%d.png\"\n";
    const auto b = Build("pc_format_file", declarations,
                         "\tformat\tfile $const1 Frame\n\ttexture\tCout file u v\n");
    ASSERT_TRUE(b.ok) << b.text;
    ExpectCompiles(b.text);
    const auto r = oslo::RunPrecomputeFunction("pc_format_file", Parameters({}, {{"Frame", 12}}));
    ASSERT_EQ(r.count("texture_file"), 1u) << b.text;
    EXPECT_EQ(r.at("texture_file").str, L"frame12.png");
}

TEST(PrecomputeFunction, IntegerStepsWrapAndNeverTrapOnDivision) {
    // file = format("%d", ((A + B) * C) / D % E): every step of the chain is kept.
    const std::string declarations = kTextureShader +
                                     "param\tint\tA\t0\nparam\tint\tB\t0\nparam\tint\tC\t0\n"
                                     "param\tint\tD\t1\nparam\tint\tE\t1\n"
                                     "local\tint\tx\nlocal\tstring\tfile\n"
                                     "const\tstring\t$const1\t\"%d\"\n";
    const std::string code = "\tadd\tx A B\n\tmul\tx x C\n\tdiv\tx x D\n\tmod\tx x E\n"
                             "\tformat\tfile $const1 x\n\ttexture\tCout file u v\n";
    const auto b = Build("pc_ints", declarations, code);
    ASSERT_TRUE(b.ok) << b.text;
    const auto run = [](int a, int bb, int c, int d, int e) {
        const auto r = oslo::RunPrecomputeFunction(
            "pc_ints", Parameters({}, {{"A", a}, {"B", bb}, {"C", c}, {"D", d}, {"E", e}}));
        return oslo::NarrowText(r.at("format_4").str);
    };
    EXPECT_EQ(run(2, 3, 4, 3, 100), "6");            // (5 * 4) / 3 = 6
    EXPECT_EQ(run(-7, 0, 1, 2, 100), "-3");          // truncation toward zero
    EXPECT_EQ(run(-7, 0, 1, 1, 3), "-1");            // remainder takes the dividend's sign
    EXPECT_EQ(run(1, 1, 1, 0, 5), "0");              // division by zero
    EXPECT_EQ(run(1, 1, 1, 1, 0), "0");              // remainder by zero
    EXPECT_EQ(run(INT_MIN, 0, 1, -1, 7), "0");       // the one quotient that overflows
    EXPECT_EQ(run(INT_MAX, 1, 1, 1, INT_MAX), "-1"); // wraps, -2^31 % (2^31 - 1)
}

TEST(PrecomputeFunction, AnUnknownFileVariableFailsTheTranslation) {
    const auto b = Build("pc_unknown", kTextureShader, "\ttexture\tCout nosuch u v\n");
    EXPECT_FALSE(b.ok);
    EXPECT_EQ(b.info.messages.count("Unknown variable 'nosuch'"), 1u);
    EXPECT_FALSE(oslo::HasPrecomputeFunction("pc_unknown"));
}

TEST(PrecomputeFunction, TextureInfoSetsItsFoundFlagAndNamesTheFile) {
    const std::string declarations = kTextureShader + "oparam\tint\tok\t0\nlocal\tint[2]\tres\n"
                                                      "const\tstring\t$const1\t\"resolution\"\n";
    const auto b = Build("pc_info", declarations, "\tgettextureinfo\tok Tex $const1 res\n");
    ASSERT_TRUE(b.ok) << b.text;
    EXPECT_TRUE(Contains(b.text, "res_[0] = texture_Tex_info.x;")) << b.text;
    ExpectCompiles(b.text);
    const auto r = oslo::RunPrecomputeFunction("pc_info", Parameters({{"Tex", "t.png"}}));
    EXPECT_EQ(r.at("texture_Tex").str, L"t.png");
}

} // namespace
