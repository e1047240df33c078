// The shipped struct headers (color2.h, color4.h, vector2.h, vector4.h, matrix33.h): their
// operator overloads and math functions compile into calls of the right overloads, and misuse
// is reported.
#include "compiler_test_support.h"

#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

struct Compiled {
    bool ok = false;
    std::string oso;
    compiler_test::CollectingHandler eh;
    std::string firstError() const { return eh.firstError(); }
};

std::unique_ptr<Compiled> compile(const std::string& header, const std::string& body) {
    auto c = std::make_unique<Compiled>();
    OSL::OSLCompiler comp(&c->eh);
    c->ok = comp.compile_buffer("#include \"" + header + "\"\nshader t (output float f = 0) {\n" +
                                    body + "\n}\n",
                                c->oso, {}, "", "t.osl");
    return c;
}

int countOps(const std::string& oso, const std::string& op) {
    int n = 0;
    for (size_t at = oso.find("\t" + op + "\t"); at != std::string::npos;
         at = oso.find("\t" + op + "\t", at + 1))
        ++n;
    return n;
}

bool calls(const std::string& oso, const std::string& fn) {
    return oso.find("\"" + fn + "\"") != std::string::npos &&
           oso.find("\tfunctioncall\t") != std::string::npos;
}

TEST(StructHeaders, ArithmeticOnEveryType) {
    struct Case {
        const char* header;
        const char* decl;
    };
    for (const Case& k : std::vector<Case>{
             {"color2.h", "color2 a = color2(0.5, 1), b = color2(2, 0.25);"},
             {"color4.h", "color4 a = color4(color(0.5), 1), b = color4(color(1, 2, 3), 0.25);"},
             {"vector2.h", "vector2 a = vector2(0.5, 1), b = vector2(2, 0.25);"},
             {"vector4.h", "vector4 a = vector4(0.5, 1, 2, 3), b = vector4(2, 0.25, 1, 1);"},
         }) {
        std::string body = std::string(k.decl) +
                           " a = a + b; a = a - b; a = a * b; a = a / b; a = -a;"
                           " a = a * 2; a = 2.0 * a; a = a / 4; a = 1 - a; a = a + 0.5;";
        auto c = compile(k.header, body);
        ASSERT_TRUE(c->ok) << k.header << ": " << c->firstError();
        for (const char* op : {"__operator__add__", "__operator__sub__", "__operator__mul__",
                               "__operator__div__", "__operator__neg__"})
            EXPECT_TRUE(calls(c->oso, op)) << k.header << " " << op;
        EXPECT_EQ(countOps(c->oso, "functioncall"), 10) << k.header;
    }
}

TEST(StructHeaders, ComparisonGivesAnInt) {
    for (const char* header : {"color2.h", "color4.h", "vector2.h", "vector4.h", "matrix33.h"}) {
        std::string type = std::string(header).substr(0, std::string(header).size() - 2);
        auto c = compile(header, type + " a, b; int same = a == b; int differ = a != b;"
                                        " if (a == b) f = 1;");
        ASSERT_TRUE(c->ok) << header << ": " << c->firstError();
        EXPECT_TRUE(calls(c->oso, "__operator__eq__")) << header;
        EXPECT_TRUE(calls(c->oso, "__operator__ne__")) << header;
        EXPECT_GE(countOps(c->oso, "eq"), 2) << header;
    }
}

TEST(StructHeaders, MathFunctionsApplyPerComponent) {
    auto c =
        compile("color2.h", "color2 a = color2(-0.5, 2);"
                            " a = abs(a); a = floor(a); a = pow(a, 2.0); a = pow(a, a);"
                            " a = clamp(a, 0.0, 1.0); a = clamp(a, a, a); a = mix(a, a, 0.5);"
                            " a = smoothstep(0.0, 1.0, a); a = min(a, a); a = sqrt(a); f = a.r;");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(countOps(c->oso, "abs"), 2);
    EXPECT_EQ(countOps(c->oso, "floor"), 2);
    EXPECT_EQ(countOps(c->oso, "pow"), 4);
    EXPECT_EQ(countOps(c->oso, "mix"), 2);
    EXPECT_EQ(countOps(c->oso, "smoothstep"), 2);
    EXPECT_EQ(countOps(c->oso, "sqrt"), 2);
    // the two clamps and the min: min and max per component through the library's clamp
    EXPECT_EQ(countOps(c->oso, "min"), 6);
    EXPECT_EQ(countOps(c->oso, "max"), 4);
}

TEST(StructHeaders, Color4MixesItsColourPart) {
    auto c = compile("color4.h", "color4 a = color4(color(0.5), 1), b;"
                                 " b = mix(a, color4(color(1), 0), 0.25); f = b.a + b.rgb[1];");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(countOps(c->oso, "mix"), 2) << "one on the colour, one on alpha";
}

TEST(StructHeaders, VectorsHaveGeometry) {
    for (const char* header : {"vector2.h", "vector4.h"}) {
        std::string type = std::string(header).substr(0, std::string(header).size() - 2);
        auto c = compile(header, type + " a, b; f = dot(a, b) + length(a) + distance(a, b);"
                                        " a = normalize(b);");
        ASSERT_TRUE(c->ok) << header << ": " << c->firstError();
        EXPECT_TRUE(calls(c->oso, "normalize")) << header;
        EXPECT_GE(countOps(c->oso, "sqrt"), 3) << header;
    }
}

TEST(StructHeaders, Matrix33KeepsItsBorder) {
    auto c = compile("matrix33.h",
                     "matrix33 a = matrix44To33(matrix(2)), b = a * a;"
                     " b = b + a; b = b * 0.5; b = transpose(b); f = determinant(b);"
                     " vector w = transform(b, vector(1, 0, 0)); f += w[0] + isValidAs33(b.m);"
                     " matrix m = matrix33To44(b / a);");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(countOps(c->oso, "determinant"), 1);
    EXPECT_EQ(countOps(c->oso, "transpose"), 1);
    EXPECT_EQ(countOps(c->oso, "transformv"), 1);
    EXPECT_GE(countOps(c->oso, "mxcompref"), 9) << "the 3x3 block is copied out";
}

TEST(StructHeaders, MisuseIsReported) {
    auto mixed = compile("color2.h", "color2 a; vector2 b; a = a + b;");
    EXPECT_FALSE(mixed->ok) << "vector2.h was not included";
    auto c = compile("vector2.h", "vector2 a; color c = a;");
    EXPECT_FALSE(c->ok);
    auto s = compile("color4.h", "color4 a; string s = \"x\"; a = a + s;");
    EXPECT_FALSE(s->ok);
}

TEST(StructHeaders, HeadersCombine) {
    auto c = compile("color4.h", "f = 0;");
    ASSERT_TRUE(c->ok);
    Compiled all;
    OSL::OSLCompiler comp(&all.eh);
    all.ok = comp.compile_buffer(
        "#include \"color2.h\"\n#include \"color4.h\"\n#include \"vector2.h\"\n"
        "#include \"vector4.h\"\n#include \"matrix33.h\"\n#include \"color2.h\"\n"
        "shader t (output float f = 0) {\n"
        "  color2 a = color2(1, 2); color4 b = color4(color(1), 2); vector2 c = vector2(1, 2);\n"
        "  vector4 d = vector4(1, 2, 3, 4);\n"
        "  f = abs(a).r + abs(b).a + abs(c).x + abs(d).w + dot(c, c) + dot(d, d);\n"
        "}\n",
        all.oso, {}, "", "t.osl");
    ASSERT_TRUE(all.ok) << all.firstError();
    EXPECT_EQ(countOps(all.oso, "abs"), 2 + 2 + 2 + 4);
}

} // namespace
