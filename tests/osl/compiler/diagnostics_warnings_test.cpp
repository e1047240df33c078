// The checks oslc makes beyond plain typing: printf-like format strings, names declared twice or
// clashing with functions and shader globals, functions defined twice. Each message, its line,
// its kind (error or warning), -Werror, `#pragma osl nowarn`, and shaders that must stay quiet.
#include "compiler_test_support.h"

#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using CapturingHandler = compiler_test::CollectingHandler;

struct Result {
    bool ok = false;
    std::string oso;
    CapturingHandler eh;
};

std::unique_ptr<Result> compile(const std::string& src, std::vector<std::string> options = {}) {
    auto r = std::make_unique<Result>();
    OSL::OSLCompiler c(&r->eh);
    r->ok = c.compile_buffer(src, r->oso, options, "", "test.osl");
    return r;
}

// A shader whose body is `body`, starting on line 3.
std::string shader(const std::string& body) {
    return "shader test (string name = \"x\", output float out = 0)\n{\n" + body + "}\n";
}

std::string all(const std::vector<std::string>& v) {
    std::string s;
    for (const auto& m : v) s += m + "\n";
    return s;
}

// ---------------------------------------------------------------- format strings

TEST(FormatCheck, MatchingConversionsAreQuiet) {
    auto r = compile(shader("    printf(\"%d %i %o %x %X\\n\", 1, 2, 3, 4, 5);\n"
                            "    printf(\"%f %g %e %5.2f %-8g\\n\", 1.0, 2.0, 3.0, 4.0, 5.0);\n"
                            "    printf(\"%s %s %s\\n\", \"a\", name, Ci);\n"
                            "    printf(\"%g %g %g\\n\", P, color(1), matrix(1));\n"
                            "    printf(\"100%% done %d\\n\", 3);\n"
                            "    int a[3] = {1, 2, 3};\n"
                            "    printf(\"%d\\n\", a);\n"
                            "    fprintf(\"out.txt\", \"%s=%g\\n\", name, u);\n"
                            "    string s = format(\"%d-%s\", 1, name);\n"
                            "    warning(\"%g\", v);\n"
                            "    error(\"no values\");\n"));
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    EXPECT_TRUE(r->eh.errors.empty()) << all(r->eh.errors);
    EXPECT_TRUE(r->eh.warnings.empty()) << all(r->eh.warnings);
}

TEST(FormatCheck, NotEnoughArguments) {
    auto r = compile(shader("    float f = 1;\n    printf(\"%g %g\\n\", f);\n"));
    EXPECT_FALSE(r->ok);
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0],
              "test.osl:4: error: printf has mismatched format string and arguments (not enough "
              "args)");
}

TEST(FormatCheck, TooManyArguments) {
    auto r = compile(shader("    printf(\"hello\\n\", 3);\n"));
    EXPECT_FALSE(r->ok);
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0],
              "test.osl:3: error: printf has mismatched format string and arguments (too many "
              "args)");
}

TEST(FormatCheck, IntNeedsAnIntegerConversion) {
    auto r = compile(shader("\n    printf(\"%g\\n\", 1);\n"));
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0], "test.osl:4: error: printf has mismatched format string and "
                               "arguments (arg 2 needs %d, %i, %o, %x, or %X)");
}

TEST(FormatCheck, UnsignedConversionIsNotAcceptedForInt) {
    // oslc's list of integer conversions leaves out %u.
    auto r = compile(shader("    printf(\"%u\\n\", 1);\n"));
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_NE(r->eh.errors[0].find("(arg 2 needs %d, %i, %o, %x, or %X)"), std::string::npos);
}

TEST(FormatCheck, FloatAndTriplesNeedAFloatConversion) {
    auto r = compile(shader("    printf(\"%d\\n\", 1.5);\n"));
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0], "test.osl:3: error: printf has mismatched format string and "
                               "arguments (arg 2 needs %f, %g, or %e)");
    auto t = compile(shader("    printf(\"%d %s\\n\", 1, P);\n"));
    ASSERT_EQ(t->eh.errors.size(), 1u) << all(t->eh.errors);
    EXPECT_NE(t->eh.errors[0].find("(arg 3 needs %f, %g, or %e)"), std::string::npos)
        << t->eh.errors[0];
}

TEST(FormatCheck, StringAndClosureNeedPercentS) {
    auto r = compile(shader("    printf(\"%d\\n\", name);\n"));
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0], "test.osl:3: error: printf has mismatched format string and "
                               "arguments (arg 2 needs %s)");
    auto c = compile(shader("    printf(\"%g\\n\", Ci);\n"));
    ASSERT_EQ(c->eh.errors.size(), 1u) << all(c->eh.errors);
    EXPECT_NE(c->eh.errors[0].find("(arg 2 needs %s)"), std::string::npos);
}

TEST(FormatCheck, FprintfCountsFromItsThirdArgument) {
    auto r = compile(shader("    fprintf(\"f.txt\", \"%g %d\\n\", 1.0, 2.0);\n"));
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0], "test.osl:3: error: fprintf has mismatched format string and "
                               "arguments (arg 4 needs %f, %g, or %e)");
}

TEST(FormatCheck, FormatErrorAndWarningAreCheckedToo) {
    for (const char* fn : {"format", "error", "warning"}) {
        std::string call = std::string(fn) == "format"
                               ? "    string s = format(\"%d\", \"a\");\n"
                               : "    " + std::string(fn) + "(\"%d\", \"a\");\n";
        auto r = compile(shader(call));
        ASSERT_EQ(r->eh.errors.size(), 1u) << fn << ": " << all(r->eh.errors);
        EXPECT_EQ(r->eh.errors[0], "test.osl:3: error: " + std::string(fn) +
                                       " has mismatched format string and arguments (arg 2 "
                                       "needs %s)");
    }
}

TEST(FormatCheck, OnlyTheFirstMismatchOfACallIsReported) {
    auto r = compile(shader("    printf(\"%d %d %d\\n\", 1.0, \"a\");\n"));
    EXPECT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
}

TEST(FormatCheck, StructValueIsReportedOnce) {
    auto r = compile("struct S { float a; };\n"
                     "shader test ()\n{\n    S s;\n    printf(\"%g\\n\", s);\n"
                     "    printf(\"\", s);\n}\n");
    ASSERT_EQ(r->eh.errors.size(), 2u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0], "test.osl:5: error: struct 'S' is not a valid argument");
    EXPECT_EQ(r->eh.errors[1],
              "test.osl:6: error: printf has mismatched format string and arguments (too many "
              "args)");
}

TEST(FormatCheck, AdjacentLiteralsFormOneConstantFormat) {
    auto r = compile(shader("    printf(\"a %d \" \"b %g\\n\", 1, 2.0);\n"));
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    EXPECT_TRUE(r->eh.warnings.empty()) << all(r->eh.warnings);
}

TEST(FormatCheck, NonConstantFormatIsAWarning) {
    auto r = compile(shader("    printf(name);\n    string s = format(name, 1);\n"));
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    ASSERT_EQ(r->eh.warnings.size(), 2u) << all(r->eh.warnings);
    EXPECT_EQ(r->eh.warnings[0],
              "test.osl:3: warning: printf() uses a format string that is not a constant.");
    EXPECT_EQ(r->eh.warnings[1],
              "test.osl:4: warning: format() uses a format string that is not a constant.");
}

TEST(FormatCheck, WerrorTurnsTheWarningIntoAnError) {
    auto r = compile(shader("    printf(name);\n"), {"-Werror"});
    EXPECT_FALSE(r->ok);
    ASSERT_EQ(r->eh.errors.size(), 1u);
    EXPECT_EQ(r->eh.errors[0],
              "test.osl:3: error: printf() uses a format string that is not a constant.");
}

TEST(FormatCheck, MismatchInsideAUserFunctionIsReportedOnceAtItsLine) {
    auto r = compile("void show(float x)\n{\n    printf(\"%d\\n\", x);\n}\n"
                     "shader test ()\n{\n    show(1);\n    show(2);\n}\n");
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0].rfind("test.osl:3: error: printf has mismatched", 0), 0u)
        << r->eh.errors[0];
}

TEST(FormatCheck, UserFunctionNamedPrintfIsNotChecked) {
    auto r = compile("void printf(int a, float b) { }\n"
                     "shader test ()\n{\n    printf(1, 2.0);\n}\n");
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    EXPECT_TRUE(r->eh.warnings.empty()) << all(r->eh.warnings);
}

// ---------------------------------------------------------------- names declared twice

TEST(Redeclaration, SameScopeIsAnErrorNamingThePreviousDeclaration) {
    auto r = compile(shader("    float x = 1;\n\n    float x = 2;\n    out = x;\n"));
    EXPECT_FALSE(r->ok);
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0], "test.osl:5: error: \"x\" already declared in this scope\n"
                               "\t\tprevious declaration was at test.osl:3");
}

TEST(Redeclaration, InnerBlocksAndFunctionsMayReuseNames) {
    auto r = compile("float helper(float mix) { float noise = mix; return noise; }\n"
                     "shader test (output float out = 0)\n{\n    float x = 1;\n"
                     "    {\n        float x = 2;\n        float mix = x;\n        out = mix;\n"
                     "    }\n    out += helper(x);\n}\n");
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    EXPECT_TRUE(r->eh.warnings.empty()) << all(r->eh.warnings);
}

TEST(Redeclaration, ShaderParameterNamedLikeAFunctionIsAWarning) {
    auto r = compile("float helper(float a) { return a; }\n"
                     "shader test (float helper = 2, output float out = 0)\n{\n"
                     "    out = helper;\n}\n");
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    ASSERT_EQ(r->eh.warnings.size(), 1u) << all(r->eh.warnings);
    EXPECT_EQ(r->eh.warnings[0], "test.osl:2: warning: \"helper\" already declared in this scope\n"
                                 "\t\tprevious declaration was at test.osl:1");
    auto w = compile("float helper(float a) { return a; }\n"
                     "shader test (float helper = 2)\n{\n}\n",
                     {"-Werror"});
    EXPECT_FALSE(w->ok);
    ASSERT_EQ(w->eh.errors.size(), 1u);
    EXPECT_EQ(w->eh.errors[0].rfind("test.osl:2: error: \"helper\" already declared", 0), 0u);
}

TEST(Redeclaration, LibraryFunctionNamesReportTheLibraryHeader) {
    auto r = compile("shader test (float noise = 1)\n{\n}\n");
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    ASSERT_EQ(r->eh.warnings.size(), 1u) << all(r->eh.warnings);
    EXPECT_EQ(r->eh.warnings[0].rfind("test.osl:1: warning: \"noise\" already declared in this "
                                      "scope\n\t\tprevious declaration was at stdosl.h:",
                                      0),
              0u)
        << r->eh.warnings[0];
}

TEST(Redeclaration, ShaderLevelLocalNamedLikeAFunctionIsAnError) {
    auto r = compile(shader("    float mix = 1;\n    float P2 = 2;\n"));
    EXPECT_FALSE(r->ok);
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0].rfind("test.osl:3: error: \"mix\" already declared in this scope\n"
                                    "\t\tprevious declaration was at stdosl.h:",
                                    0),
              0u)
        << r->eh.errors[0];
}

// The shader globals share the shader's scope: a parameter or top-level local may not take one
// of their names, but a function's locals and inner blocks may.
TEST(Redeclaration, ShaderGlobalNamesAreTakenAtShaderLevel) {
    auto param = compile("shader test (float v = 1, output float out = 0)\n{\n    out = v;\n}\n");
    EXPECT_FALSE(param->ok);
    ASSERT_EQ(param->eh.errors.size(), 1u) << all(param->eh.errors);
    EXPECT_EQ(param->eh.errors[0], "test.osl:1: error: \"v\" already declared in this scope");
    auto local = compile(shader("    point P = 0;\n    out = P[0];\n"));
    EXPECT_FALSE(local->ok);
    ASSERT_EQ(local->eh.errors.size(), 1u) << all(local->eh.errors);
    EXPECT_EQ(local->eh.errors[0], "test.osl:3: error: \"P\" already declared in this scope");
    auto inner =
        compile("float f(float u) { float N = u; return N; }\n"
                "shader test (output float out = 0)\n{\n    { float v = 2; out = f(v); }\n}\n");
    EXPECT_TRUE(inner->ok) << all(inner->eh.errors);
    auto fn = compile("float P(float x) { return x; }\nshader test ()\n{\n}\n");
    ASSERT_EQ(fn->eh.errors.size(), 1u) << all(fn->eh.errors);
    EXPECT_EQ(fn->eh.errors[0],
              "test.osl:1: error: \"P\" already declared in this scope as a point");
}

// ---------------------------------------------------------------- functions defined twice

TEST(Redefinition, SameSignatureTwiceWarnsWithEarlierPlaces) {
    auto r = compile("float f(float a) { return a; }\n"
                     "float f(float a) { return a * 2; }\n"
                     "\n"
                     "float f(float a) { return a * 3; }\n"
                     "shader test (output float out = 0)\n{\n    out = f(1);\n}\n");
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    ASSERT_EQ(r->eh.warnings.size(), 2u) << all(r->eh.warnings);
    EXPECT_EQ(r->eh.warnings[0], "test.osl:2: warning: Function 'float f (float)' redefined in "
                                 "the same scope\n  Previous definitions:\n    test.osl:1");
    EXPECT_EQ(r->eh.warnings[1], "test.osl:4: warning: Function 'float f (float)' redefined in "
                                 "the same scope\n  Previous definitions:\n    test.osl:2\n"
                                 "    test.osl:1");
    // The last definition is the one called: its constant 3 is there, the earlier 2 is not.
    EXPECT_NE(r->oso.find("\t3\t\t%read"), std::string::npos) << r->oso;
    EXPECT_EQ(r->oso.find("\t2\t\t%read"), std::string::npos) << r->oso;
    EXPECT_NE(r->oso.find("\tmul\t"), std::string::npos) << r->oso;
}

TEST(Redefinition, OverloadsAndPrototypesAreNotRedefinitions) {
    auto r = compile("float f(float a);\n"
                     "float f(float a) { return a; }\n"
                     "float f(int a) { return a; }\n"
                     "color f(color a) { return a; }\n"
                     "shader test (output float out = 0)\n{\n    out = f(1.0) + f(2);\n}\n");
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    EXPECT_TRUE(r->eh.warnings.empty()) << all(r->eh.warnings);
}

TEST(Redefinition, RedefiningALibraryFunctionWarns) {
    auto r = compile("float mix(float a, float b, float t) { return a; }\n"
                     "shader test (output float out = 0)\n{\n    out = mix(1.0, 2.0, 0.5);\n}\n");
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    ASSERT_EQ(r->eh.warnings.size(), 1u) << all(r->eh.warnings);
    EXPECT_EQ(r->eh.warnings[0].rfind("test.osl:1: warning: Function 'float mix (float, float, "
                                      "float)' redefined in the same scope\n  Previous "
                                      "definitions:\n    stdosl.h:",
                                      0),
              0u)
        << r->eh.warnings[0];
}

TEST(Redefinition, WerrorMakesItAnError) {
    auto r = compile("float f(float a) { return a; }\nfloat f(float a) { return a; }\n"
                     "shader test ()\n{\n}\n",
                     {"-Werror"});
    EXPECT_FALSE(r->ok);
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0].rfind("test.osl:2: error: Function 'float f (float)' redefined", 0),
              0u);
}

// ---------------------------------------------------------------- #pragma osl nowarn

TEST(NoWarnPragma, SilencesOnlyTheNextLine) {
    auto r = compile(shader("#pragma osl nowarn\n"
                            "    printf(name);\n"
                            "    printf(name);\n"));
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    ASSERT_EQ(r->eh.warnings.size(), 1u) << all(r->eh.warnings);
    EXPECT_EQ(r->eh.warnings[0].rfind("test.osl:5: warning: printf()", 0), 0u) << r->eh.warnings[0];
}

TEST(NoWarnPragma, AlsoSilencesWarningsThatWerrorWouldTurnIntoErrors) {
    auto r = compile(shader("    int i;\n#pragma osl nowarn\n    i = 1.5;\n"), {"-Werror"});
    EXPECT_TRUE(r->ok) << all(r->eh.errors);
    EXPECT_TRUE(r->eh.errors.empty()) << all(r->eh.errors);
}

TEST(NoWarnPragma, ErrorsAreStillReported) {
    auto r = compile(shader("#pragma osl nowarn\n    printf(\"%d\", 1.0);\n"));
    EXPECT_FALSE(r->ok);
    ASSERT_EQ(r->eh.errors.size(), 1u) << all(r->eh.errors);
    EXPECT_EQ(r->eh.errors[0].rfind("test.osl:4: error: printf has mismatched", 0), 0u);
}

TEST(NoWarnPragma, OtherPragmasLeaveWarningsAlone) {
    auto r = compile(shader("#pragma osl something_else\n#pragma nowarn\n    printf(name);\n"));
    EXPECT_EQ(r->eh.warnings.size(), 1u) << all(r->eh.warnings);
}

// ---------------------------------------------------------------- wording of other errors

TEST(ErrorWording, MatchesOslc) {
    auto ret = compile(shader("    return 1;\n"));
    ASSERT_EQ(ret->eh.errors.size(), 1u) << all(ret->eh.errors);
    EXPECT_EQ(ret->eh.errors[0], "test.osl:3: error: Cannot return a value from a shader body");
    auto neg = compile(shader("    string s = -name;\n"));
    ASSERT_FALSE(neg->eh.errors.empty());
    EXPECT_EQ(neg->eh.errors[0], "test.osl:3: error: Can't do '-' to a string.");
    auto dup = compile("struct A { float x; };\nstruct A { float y; };\nshader test ()\n{\n}\n");
    ASSERT_EQ(dup->eh.errors.size(), 1u) << all(dup->eh.errors);
    EXPECT_EQ(dup->eh.errors[0], "test.osl:2: error: \"A\" already declared in this scope");
    auto fn = compile("struct noise { float x; };\nshader test ()\n{\n}\n");
    ASSERT_EQ(fn->eh.errors.size(), 1u) << all(fn->eh.errors);
    EXPECT_EQ(fn->eh.errors[0], "test.osl:1: error: \"noise\" already declared in this scope");
}

TEST(ErrorWording, OperatorsIndicesAndDeclarations) {
    auto bin = compile(shader("    float x = name * 2;\n    x += name;\n"));
    ASSERT_EQ(bin->eh.errors.size(), 2u) << all(bin->eh.errors);
    EXPECT_EQ(bin->eh.errors[0], "test.osl:3: error: Not allowed: 'string * int'");
    EXPECT_EQ(bin->eh.errors[1], "test.osl:4: error: Not allowed: 'float + string'");
    auto idx = compile(shader("    float a[2];\n    float x = a[1.5];\n    x = P[0.5];\n"));
    ASSERT_EQ(idx->eh.errors.size(), 2u) << all(idx->eh.errors);
    EXPECT_EQ(idx->eh.errors[0], "test.osl:4: error: array index must be an integer, not a float");
    EXPECT_EQ(idx->eh.errors[1],
              "test.osl:5: error: component index must be an integer, not a float");
    auto param = compile("shader test (float a, float b = 1)\n{\n}\n");
    ASSERT_EQ(param->eh.errors.size(), 1u) << all(param->eh.errors);
    EXPECT_EQ(param->eh.errors[0],
              "test.osl:1: error: shader parameter 'a' requires a default initializer");
    auto fparam = compile("float f(float a = 1) { return a; }\nshader test ()\n{\n}\n");
    ASSERT_EQ(fparam->eh.errors.size(), 1u) << all(fparam->eh.errors);
    EXPECT_EQ(fparam->eh.errors[0],
              "test.osl:1: error: function parameter 'a' may not have a default initializer.");
    auto under = compile("float ___f(float a) { return a; }\nshader test ()\n{\n"
                         "    float ___x = 1;\n}\n");
    ASSERT_EQ(under->eh.errors.size(), 2u) << all(under->eh.errors);
    EXPECT_EQ(under->eh.errors[0],
              "test.osl:1: error: \"___f\" : sorry, can't start with three underscores");
    EXPECT_EQ(under->eh.errors[1],
              "test.osl:4: error: \"___x\" : sorry, can't start with three underscores");
    auto two = compile(shader("    float __x = 1;\n    out = __x;\n"));
    EXPECT_TRUE(two->ok) << all(two->eh.errors);
}

TEST(ErrorWording, ConditionsCastsAndAssignments) {
    auto cond = compile("struct S { float a; };\n"
                        "shader test (output float out = 0)\n{\n    S s;\n    float arr[2];\n"
                        "    closure color cc = 0;\n"
                        "    if (s) out = 1;\n    if (arr) out = 1;\n    if (cc) out = 1;\n"
                        "    while (arr) out = 2;\n    for (; s; ) out = 2;\n"
                        "    do { out = 1; } while (cc);\n    out = cc ? 1 : 2;\n}\n");
    ASSERT_EQ(cond->eh.errors.size(), 6u) << all(cond->eh.errors);
    EXPECT_EQ(cond->eh.errors[0], "test.osl:7: error: Cannot use a struct as an 'if' condition");
    EXPECT_EQ(cond->eh.errors[1], "test.osl:8: error: Cannot use an array as an 'if' condition");
    // A closure may be tested by `if` (is it empty?), but not by a loop or `?:`.
    EXPECT_EQ(cond->eh.errors[2],
              "test.osl:10: error: Cannot use an array as an 'while' condition");
    EXPECT_EQ(cond->eh.errors[3], "test.osl:11: error: Cannot use a struct as an 'for' condition");
    EXPECT_EQ(cond->eh.errors[4],
              "test.osl:12: error: Cannot use a closure as an 'dowhile' condition");
    EXPECT_EQ(cond->eh.errors[5], "test.osl:13: error: Cannot use a closure as a condition");

    auto cast = compile(shader("    color c = (color) name;\n    float f = (float) P;\n"
                               "    int i = (int) 1.5;\n    vector d = (vector) P;\n"));
    ASSERT_EQ(cast->eh.errors.size(), 2u) << all(cast->eh.errors);
    EXPECT_EQ(cast->eh.errors[0], "test.osl:3: error: Cannot cast 'string' to 'color'");
    EXPECT_EQ(cast->eh.errors[1], "test.osl:4: error: Cannot cast 'point' to 'float'");

    auto lv = compile(shader("    (out + 1) = 2;\n"));
    ASSERT_EQ(lv->eh.errors.size(), 1u) << all(lv->eh.errors);
    EXPECT_EQ(lv->eh.errors[0],
              "test.osl:3: error: Can't assign via = to something that isn't an lvalue");

    auto sa =
        compile("struct R { string f; };\n"
                "shader test (R files[2] = { {\"a\"}, {\"b\"} }, output float out = 0)\n{\n}\n");
    ASSERT_EQ(sa->eh.errors.size(), 1u) << all(sa->eh.errors);
    EXPECT_EQ(sa->eh.errors[0], "test.osl:2: error: array of struct are not allowed as parameters");
}

} // namespace
