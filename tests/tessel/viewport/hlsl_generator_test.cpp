// The generator core: globals, declarations, sections, control flow, function calls and the
// accuracy measure; every successful translation here must also compile.
#include "hlsl_compile_check.h"
#include "translate_support.h"

#include <gtest/gtest.h>

namespace {

using viewport_test::Contains;
using viewport_test::OSO;
using viewport_test::Translate;

void ExpectCompiles(const std::string& hlsl) {
    if (!viewport_test::GlslangAvailable()) return;
    const auto result = viewport_test::CompileGenerated(hlsl);
    EXPECT_TRUE(result.ok) << result.log;
}

TEST(GenerateHLSL, GlobalsBecomeStateFields) {
    const auto t = Translate(OSO("oparam\tfloat\tr\t0\noparam\tpoint\tq\t0 0 0\n"
                                 "global\tpoint\tP\nglobal\tfloat\tu\n",
                                 "code ___main___\n\tassign\tq P\n\tassign\tr u\n\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tq_ = state.position;\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = state.tex_coord[0].x;\n"));
    EXPECT_TRUE(Contains(t.text, "void F(out float r_, out float3 q_)\n{\n"));
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, UnknownGlobalFailsAndLeavesTheOutput) {
    const auto t = Translate(OSO("oparam\tfloat\tr\t0\nglobal\tfloat\ttime\n",
                                 "code ___main___\n\tassign\tr time\n\tend\n"));
    EXPECT_FALSE(t.ok);
    EXPECT_EQ(t.text, "untouched");
    EXPECT_EQ(t.info.messages.count("Unknown variable 'time'"), 1u);
}

TEST(GenerateHLSL, WholeTextOfBranches) {
    const auto t = Translate(OSO("param\tint\tc\t0\noparam\tfloat\tr\t0\n"
                                 "const\tfloat\t$const1\t1\nconst\tfloat\t$const2\t2\n",
                                 "code ___main___\n"
                                 "\tif\tc 2 2\n"
                                 "\tassign\tr $const1\n"
                                 "\tif\tc 4 5\n"
                                 "\tassign\tr $const1\n"
                                 "\tassign\tr $const2\n"
                                 "\tend\n"));
    ASSERT_TRUE(t.ok);
    EXPECT_EQ(t.text, "void F(int c_, out float r_)\n{\n"
                      "\tr_ = 0.00000;\n"
                      "\n"
                      "\tif(c_) {\n"
                      "\t\tr_ = 1.00000;\n"
                      "\t}\n"
                      "\tif(c_) {\n"
                      "\t\tr_ = 1.00000;\n"
                      "\t} else {\n"
                      "\t\tr_ = 2.00000;\n"
                      "\t}\n"
                      "\t\n"
                      "\n}\n");
    EXPECT_EQ(t.info.opCount, 6);
    EXPECT_EQ(t.info.accuracy, 100);
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, ForLoopTestsItsConditionAtTheTopOfAnEndlessLoop) {
    const auto t = Translate(OSO("oparam\tint\tr\t0\nlocal\tint\ti\ntemp\tint\t$tmp1\n"
                                 "const\tint\t$const1\t0\nconst\tint\t$const2\t4\n"
                                 "const\tint\t$const3\t1\n",
                                 "code ___main___\n"
                                 "\tfor\t$tmp1 2 3 5 6\n"
                                 "\tassign\ti $const1\n"
                                 "\tlt\t$tmp1 i $const2\n"
                                 "\tadd\tr r i\n"
                                 "\tcontinue\n"
                                 "\tadd\ti i $const3\n"
                                 "\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\t\n"
                                 "\ti_ = 0;\n"
                                 "\t[fastopt] for(;;) {\n"
                                 "\t\t_tmp1_ = (i_ < 4) ? 1 : 0;\n"
                                 "\t\tif(0 == _tmp1_) break;\n"
                                 "\t\tr_ = r_ + i_;\n"
                                 "\t\tcontinue;\n"
                                 "\t\ti_ = i_ + 1;\n"
                                 "\t}\n"
                                 "\n"
                                 "\t\n"))
        << t.text;
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, DoWhileSkipsItsTestOnTheFirstPass) {
    const auto t = Translate(OSO("oparam\tint\tr\t0\ntemp\tint\t$tmp1\nconst\tint\t$const1\t4\n"
                                 "const\tint\t$const2\t1\n",
                                 "code ___main___\n"
                                 "\tdowhile\t$tmp1 1 2 3 3\n"
                                 "\tlt\t$tmp1 r $const1\n"
                                 "\tadd\tr r $const2\n"
                                 "\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\t{\n"
                                 "\t\tbool __first = true;\n"
                                 "\t\t[fastopt] for(;;) {\n"
                                 "\t\t\t_tmp1_ = (r_ < 4) ? 1 : 0;\n"
                                 "\t\t\tif(!__first && 0 == _tmp1_) break;\n"
                                 "\t\t\t__first = false;\n"
                                 "\t\t\tr_ = r_ + 1;\n"
                                 "\t\t}\n"
                                 "\t}\n"
                                 "\n"))
        << t.text;
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, ReturnInsideAnInlinedFunctionLeavesAOnePassLoop) {
    const auto t = Translate(OSO("param\tint\tc\t0\noparam\tfloat\tr\t0\n"
                                 "const\tstring\t$const1\t\"helper\"\nconst\tfloat\t$const2\t1\n",
                                 "code ___main___\n"
                                 "\tfunctioncall\t$const1 4\n"
                                 "\tif\tc 3 3\n"
                                 "\treturn\n"
                                 "\tassign\tr $const2\n"
                                 "\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    const std::string hash = oslo::HashText("helper");
    EXPECT_TRUE(Contains(t.text, "\tdo { //" + hash +
                                     "/*helper*/\n"
                                     "\t\tif(c_) {\n"
                                     "\t\t\tbreak;\n"
                                     "\t\t}\n"
                                     "\t\tr_ = 1.00000;\n"
                                     "\t} while(false);\n"
                                     "\t\n"))
        << t.text;
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, FunctionWithoutReturnIsOnlyAComment) {
    const auto t = Translate(OSO("oparam\tfloat\tr\t0\nconst\tstring\t$const1\t\"helper\"\n"
                                 "const\tfloat\t$const2\t1\n",
                                 "code ___main___\n"
                                 "\tfunctioncall\t$const1 2\n"
                                 "\tassign\tr $const2\n"
                                 "\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(
        Contains(t.text, "\t//" + oslo::HashText("helper") + "/*helper*/\n\tr_ = 1.00000;"));
    EXPECT_FALSE(Contains(t.text, "do {"));
    EXPECT_EQ(t.info.opCount, 3);
    EXPECT_EQ(t.info.unsupportedCount, 0);
}

TEST(GenerateHLSL, ParameterSectionsRunUnderTheirUseDefaultFlag) {
    // Section "Scale" holds global index 0 and "Tint" index 1, so ___main___ starts at 2 and
    // its "if" ends at global index 4.
    const auto t = Translate(OSO("param\tfloat\tScale\t1\nparam\tcolor\tTint\t1 1 1\n"
                                 "oparam\tcolor\tOut\t0 0 0\nglobal\tfloat\tu\nglobal\tfloat\tv\n",
                                 "code Tint\n\tcolor\tTint u v u\n"
                                 "code Scale\n\tassign\tScale u\n"
                                 "code ___main___\n"
                                 "\tif\tScale 4 4\n"
                                 "\tmul\tOut Tint Scale\n"
                                 "\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "void F(float Scale_, float3 Tint_, int UseDefault_Scale_, "
                                 "int UseDefault_Tint_, out float3 Out_)\n"));
    EXPECT_TRUE(Contains(t.text, "\tif(UseDefault_Scale_)\n\t{\n\t\tScale_ = "
                                 "state.tex_coord[0].x;\n\t}\n\n"
                                 "\tif(UseDefault_Tint_)\n\t{\n"));
    EXPECT_TRUE(Contains(t.text, "\tif(Scale_) {\n\t\tOut_ = Tint_ * Scale_;\n\t}\n\t\n"))
        << t.text;
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, BranchThatEndsWithAParameterSectionIsClosed) {
    const auto t = Translate(OSO("param\tfloat\tScale\t1\nglobal\tfloat\tu\n"
                                 "oparam\tfloat\tr\t0\n",
                                 "code Scale\n\tif\tu 2 2\n\tassign\tScale u\n"
                                 "code ___main___\n\tassign\tr Scale\n\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, ArrayConstantsAreInitialisedArrays) {
    const auto t = Translate(OSO("oparam\tfloat\tr\t0\nconst\tfloat[2]\t$const1\t1 2.5\n"
                                 "const\tint[3]\t$const2\t4 5 6\n"
                                 "const\tcolor[2]\t$const3\t1 0 0 0 1 0\n"
                                 "const\tint\t$const4\t1\n",
                                 "code ___main___\n\taref\tr $const1 $const4\n\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tfloat _const1_[2] = {1,2.5};\n"));
    EXPECT_TRUE(Contains(t.text, "\tint _const2_[3] = {4,5,6};\n"));
    EXPECT_TRUE(Contains(t.text, "\tfloat3 _const3_[2] = {float3(1,0,0) ,float3(0,1,0) };\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = _const1_[1];\n"));
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, StringArrayConstantsHoldTheHashOfEachElement) {
    const auto t = Translate(OSO("oparam\tint\tr\t0\nconst\tstring[2]\t$const1\t\"a\" \"b\"\n"
                                 "const\tint\t$const2\t1\n",
                                 "code ___main___\n\taref\tr $const1 $const2\n\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text, "\tint _const1_[2] = {" + oslo::HashText("a") + "," +
                                     oslo::HashText("b") + "};\n"));
    EXPECT_TRUE(Contains(t.text, "\tr_ = _const1_[1];\n"));
    EXPECT_EQ(t.info.messages.count("Unsupported array constant"), 0u);
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, MatrixArrayConstantsListEachMatrix) {
    std::string values;
    for (int m = 0; m < 2; ++m)
        for (int i = 0; i < 16; ++i) values += std::to_string(i % 5 == 0 ? m + 1 : 0) + " ";
    const auto t = Translate(OSO("oparam\tmatrix\tr\t1 0 0 0 0 1 0 0 0 0 1 0 0 0 0 1\n"
                                 "const\tmatrix[2]\t$const1\t" +
                                     values + "\nconst\tint\t$const2\t1\n",
                                 "code ___main___\n\taref\tr $const1 $const2\n\tend\n"));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_TRUE(Contains(t.text,
                         "\tfloat4x4 _const1_[2] = {float4x4(1,0,0,0,0,1,0,0,0,0,1,0,0,0,0,1) "
                         ",float4x4(2,0,0,0,0,2,0,0,0,0,2,0,0,0,0,2) };\n"))
        << t.text;
    ExpectCompiles(t.text);
}

TEST(GenerateHLSL, AccuracyCountsUnsupportedInstructions) {
    std::string code = "code ___main___\n";
    for (int i = 0; i < 8; ++i) code += "\tassign\tr $const1\n";
    code += "\ttrace\thit P I\n\tend\n";
    const std::string declarations = "oparam\tfloat\tr\t0\nlocal\tint\thit\nglobal\tpoint\tP\n"
                                     "global\tvector\tI\nconst\tfloat\t$const1\t1\n";
    const auto t = Translate(OSO(declarations, code));
    ASSERT_TRUE(t.ok) << t.text;
    EXPECT_EQ(t.info.opCount, 10);
    EXPECT_EQ(t.info.unsupportedCount, 1);
    EXPECT_EQ(t.info.accuracy, 90);
    EXPECT_TRUE(Contains(t.text, "\thit_ = 0;\n"));
    EXPECT_EQ(t.info.messages.at("'trace' function not supported - ignored."), 1);

    const auto withString = Translate(OSO(declarations + "oparam\tstring\tname\t\"\"\n", code));
    ASSERT_TRUE(withString.ok);
    EXPECT_EQ(withString.info.unsupportedCount, 2);
    EXPECT_EQ(withString.info.accuracy, 45);
    EXPECT_EQ(withString.info.messages.count("Dynamic string outputs (per object) not supported"),
              1u);
    ExpectCompiles(withString.text);
}

TEST(GenerateHLSL, UnknownOpFailsTheTranslation) {
    oslo::_hlsl_info earlier;
    earlier.messages["kept from before"] = 2;
    const auto t = Translate(
        OSO("oparam\tfloat\tr\t0\nglobal\tpoint\tP\n", "code ___main___\n\twobble\tr P P\n\tend\n"),
        earlier);
    EXPECT_FALSE(t.ok);
    EXPECT_EQ(t.text, "untouched");
    EXPECT_EQ(t.info.messages.at("Unknown OPcode 'wobble' - conversion failed."), 1);
    EXPECT_EQ(t.info.messages.at("kept from before"), 2);
    EXPECT_EQ(t.info.unsupportedCount, 1);
    EXPECT_EQ(t.info.accuracy, 0);
}

TEST(GenerateHLSL, MissingMainSectionOrBadTextFails) {
    EXPECT_FALSE(Translate(OSO("param\tfloat\tScale\t1\nglobal\tfloat\tu\n",
                               "code Scale\n\tassign\tScale u\n\tend\n"))
                     .ok);
    EXPECT_FALSE(Translate("not an OSO text").ok);
}

TEST(GenerateHLSL, ClosuresFail) {
    const auto op =
        Translate(OSO("oparam\tclosure color\tCi\nconst\tstring\t$const1\t\"emission\"\n",
                      "code ___main___\n\tclosure\tCi $const1\n\tend\n"));
    EXPECT_FALSE(op.ok);
    EXPECT_EQ(op.info.messages.count("Unknown OPcode 'closure' - conversion failed."), 1u);

    const auto local = Translate(OSO("local\tclosure color\tcc\n", "code ___main___\n\tend\n"));
    EXPECT_FALSE(local.ok);
    EXPECT_EQ(local.info.messages.count("'closure' not supported"), 1u);
}

TEST(GenerateHLSL, UnsizedArrayInputsFail) {
    const auto t = Translate(OSO("param\tfloat[]\ta\t1 2\noparam\tfloat\tr\t0\n"
                                 "const\tint\t$const1\t0\n",
                                 "code ___main___\n\taref\tr a $const1\n\tend\n"));
    EXPECT_FALSE(t.ok);
    EXPECT_EQ(t.info.messages.count("Unsupported type"), 1u);
}

TEST(GenerateHLSL, RegistrationIsNotAvailableWithoutAnOutputText) {
    oslo::_hlsl_info info;
    info.accuracy = 55;
    EXPECT_FALSE(oslo::GenerateHLSL("F", OSO("oparam\tfloat\tr\t0\n", "code ___main___\n\tend\n"),
                                    info, nullptr));
    EXPECT_EQ(info.accuracy, 0);
}

TEST(GenerateHLSL, IncludeListPrecedesTheFunction) {
    const auto t = Translate(
        OSO("oparam\tfloat\tr\t0\nglobal\tfloat\tu\n", "code ___main___\n\terf\tr u\n\tend\n"));
    ASSERT_TRUE(t.ok);
    EXPECT_EQ(t.text.rfind("/* == ADDITIONAL SETTINGS: \ninclude:ksg_util.h\n*/\nvoid F(", 0), 0u)
        << t.text;
    ExpectCompiles(t.text);
}

} // namespace
