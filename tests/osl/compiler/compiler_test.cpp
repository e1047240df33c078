// Compiles small shaders through OSLCompiler::compile_buffer and checks the OSO it writes and
// the diagnostics it reports.
#include "compiler_test_support.h"

#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using CapturingHandler = compiler_test::CollectingHandler;

struct Result {
    bool ok;
    std::string oso;
    CapturingHandler eh;
};

std::unique_ptr<Result> compile(const std::string& src, std::vector<std::string> options = {},
                                const std::string& filename = "") {
    auto r = std::make_unique<Result>();
    OSL::OSLCompiler c(&r->eh);
    r->ok = c.compile_buffer(src, r->oso, options, "", filename);
    return r;
}

bool hasLine(const std::string& oso, const std::string& line) {
    return oso.find(line) != std::string::npos;
}

TEST(Compiler, SimpleShaderProducesHeaderSymbolsAndOps) {
    auto r = compile(
        "shader test (float Kd = 0.5, output color Cout = 0) { Cout = Kd * color(1, 2, 3); }");
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    EXPECT_TRUE(hasLine(r->oso, "OpenShadingLanguage 1.00\n"));
    EXPECT_TRUE(hasLine(r->oso, "\nshader test\n"));
    EXPECT_TRUE(hasLine(r->oso, "param\tfloat\tKd\t0.5\t\t%read{"));
    EXPECT_TRUE(hasLine(r->oso, "oparam\tcolor\tCout\t0 0 0\t\t"));
    EXPECT_TRUE(hasLine(r->oso, "code ___main___\n"));
    // A constructor of constants is itself a constant, as oslc makes it.
    EXPECT_TRUE(hasLine(r->oso, "\t1 2 3\t\t%read{0,0}")) << r->oso;
    EXPECT_FALSE(hasLine(r->oso, "\tcolor\t\t"));
    EXPECT_TRUE(hasLine(r->oso, "\tmul\t\t"));
    EXPECT_TRUE(hasLine(r->oso, "\tend\n"));
}

TEST(Compiler, ErrorsNameBufferAndLine) {
    auto r = compile("shader test ()\n{\n    float x = undefined_thing;\n}\n");
    EXPECT_FALSE(r->ok);
    ASSERT_FALSE(r->eh.errors.empty());
    EXPECT_EQ(r->eh.errors[0].rfind("<buffer>:3: error: ", 0), 0u) << r->eh.errors[0];
}

TEST(Compiler, ErrorsNameTheGivenFile) {
    auto r = compile("shader test ()\n{\n    int i = \"s\";\n}\n", {}, "mine.osl");
    EXPECT_FALSE(r->ok);
    ASSERT_FALSE(r->eh.errors.empty());
    EXPECT_EQ(r->eh.errors[0].rfind("mine.osl:3: error: ", 0), 0u) << r->eh.errors[0];
}

TEST(Compiler, SyntaxErrorIsReportedOnItsLine) {
    auto r = compile("shader test ()\n{\n    float x = 1\n    x = 2;\n}\n");
    EXPECT_FALSE(r->ok);
    ASSERT_FALSE(r->eh.errors.empty());
    EXPECT_EQ(r->eh.errors[0].rfind("<buffer>:4: error: ", 0), 0u) << r->eh.errors[0];
}

TEST(Compiler, ControlFlowOpsHaveTheirJumpTargets) {
    auto r = compile("shader test (output float f = 0) {\n"
                     "  for (int i = 0; i < 4; ++i) { if (i == 2) continue; f += i; }\n"
                     "  while (f > 1) f -= 1;\n"
                     "  do { f += 0.5; } while (f < 0);\n"
                     "}\n");
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    EXPECT_TRUE(hasLine(r->oso, "\tfor\t\t"));
    EXPECT_TRUE(hasLine(r->oso, "\twhile\t\t"));
    EXPECT_TRUE(hasLine(r->oso, "\tdowhile\t\t"));
    EXPECT_TRUE(hasLine(r->oso, "\tcontinue"));
    EXPECT_TRUE(hasLine(r->oso, "\tif\t\t"));
}

TEST(Compiler, UserFunctionsAreInlinedAfterFunctioncall) {
    auto r = compile("float sqr (float a) { return a * a; }\n"
                     "shader test (output float f = 0) { f = sqr(u); }\n");
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    EXPECT_TRUE(hasLine(r->oso, "\tfunctioncall\t$const"));
    EXPECT_TRUE(hasLine(r->oso, "global\tfloat\tu\t"));
}

TEST(Compiler, OverloadMismatchListsCandidates) {
    auto r = compile("void funca (int a) {}\nshader test () { funca(1.5, 2); }\n", {}, "t.osl");
    EXPECT_FALSE(r->ok);
    ASSERT_FALSE(r->eh.errors.empty());
    EXPECT_NE(
        r->eh.errors[0].find("t.osl:2: error: No matching function call to 'funca (float, int)'"),
        std::string::npos)
        << r->eh.errors[0];
}

TEST(Compiler, WritingAnInputFunctionParameterIsRejected) {
    auto r =
        compile("float f (float x) { x = 1; return x; }\nshader test () { float y = f(2); }\n");
    EXPECT_FALSE(r->ok);
    ASSERT_FALSE(r->eh.errors.empty());
    EXPECT_NE(r->eh.errors[0].find("cannot write to non-output parameter \"x\""),
              std::string::npos);
}

TEST(Compiler, StructParametersExpandToFields) {
    auto r =
        compile("struct pair { float a; color b; };\n"
                "shader test (pair p = {1, color(2)}, output float o = 0) { o = p.a + p.b[1]; }\n");
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    EXPECT_TRUE(hasLine(r->oso, "param\tstruct pair\tp\t"));
    EXPECT_TRUE(hasLine(r->oso, "param\tfloat\tp.a\t1\t\t"));
    EXPECT_TRUE(hasLine(r->oso, "%mystruct{p} %mystructfield{1}"));
}

TEST(Compiler, MetadataIsWrittenAsHints) {
    auto r = compile(
        "shader test (float k = 1 [[ string help = \"a \\\"b\\\"\", float min = 0 ]]) {}\n");
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    EXPECT_TRUE(hasLine(r->oso, "%meta{string,help,\"a \\\"b\\\"\"} %meta{float,min,0}"));
}

TEST(Compiler, ComputedDefaultGetsItsOwnCodeSection) {
    auto r = compile("shader test (float a = u * 2, output float o = 0) { o = a; }\n");
    ASSERT_TRUE(r->ok);
    EXPECT_TRUE(hasLine(r->oso, "code a\n"));
    EXPECT_TRUE(hasLine(r->oso, "%initexpr"));
}

TEST(Compiler, PreprocessorDefinesReachTheSource) {
    auto r =
        compile("#if OSL_VERSION >= 11200 && defined(FOO)\nshader test (int x = FOO) {}\n#endif\n",
                {"-DFOO=3"});
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    EXPECT_TRUE(hasLine(r->oso, "param\tint\tx\t3\t\t"));
}

TEST(Compiler, PragmaErrorFails) {
    auto r = compile("shader test () {\n#pragma error \"stop here\"\n}\n");
    EXPECT_FALSE(r->ok);
    ASSERT_FALSE(r->eh.errors.empty());
    EXPECT_EQ(r->eh.errors[0], "<buffer>:2: error: stop here");
}

TEST(Compiler, WerrorTurnsWarningsIntoErrors) {
    const char* src = "shader test () { float f = 1.5; int i = f; }\n";
    EXPECT_TRUE(compile(src)->ok);
    EXPECT_FALSE(compile(src, {"-Werror"})->ok);
}

TEST(Compiler, StructHeadersShipWithTheCompiler) {
    auto r = compile(
        "#include \"color4.h\"\n#include \"vector2.h\"\n#include \"matrix33.h\"\n"
        "shader test (color4 c = {color(1), 0.5}, output vector2 w = {0, 0}) { w.x = c.a; }\n");
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    EXPECT_TRUE(hasLine(r->oso, "param\tcolor\tc.rgb\t1 1 1\t\t"));
}

TEST(Compiler, NoShaderIsAnError) {
    auto r = compile("float f (float x) { return x; }\n");
    EXPECT_FALSE(r->ok);
    EXPECT_FALSE(r->eh.errors.empty());
}

} // namespace

// A declaration's initialiser still sees the outer variable it is about to hide, as oslc has it.
TEST(CompilerScopes, InitialiserReadsTheOuterVariableOfTheSameName) {
    auto r = compile("shader t (string filename = \"a.tif\") {\n"
                     "    if (u > 0) {\n"
                     "        string filename = (u > 0.5) ? \"b\" : filename;\n"
                     "        printf(\"%s\", filename);\n"
                     "    }\n"
                     "}\n");
    ASSERT_TRUE(r->ok) << (r->eh.errors.empty() ? "" : r->eh.errors[0]);
    const size_t inner = r->oso.find("local\tstring\t");
    ASSERT_NE(inner, std::string::npos) << r->oso;
    const size_t start = inner + 13;
    const std::string innerName = r->oso.substr(start, r->oso.find('\t', start) - start);
    // The inner variable is assigned from the parameter, never from itself.
    EXPECT_TRUE(hasLine(r->oso, "\tassign\t\t" + innerName + " filename ")) << r->oso;
    EXPECT_FALSE(hasLine(r->oso, " " + innerName + " " + innerName)) << r->oso;
}
