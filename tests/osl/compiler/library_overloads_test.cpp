// Standard-library calls whose overloads reach beyond plain values: messages and queries of
// closure arrays, which the reference compiler accepts.
#include "compiler_test_support.h"

#include <gtest/gtest.h>

#include <string>

using compiler_test::CollectingHandler;
using compiler_test::compileOrFail;

namespace {

TEST(LibraryOverloads, ClosureArraysTravelThroughMessages) {
    CollectingHandler eh;
    std::string oso = compileOrFail("shader t () {\n"
                                    "    closure color C[2] = { diffuse(N), emission() };\n"
                                    "    setmessage (\"C\", C);\n"
                                    "    closure color got[2];\n"
                                    "    int ok = getmessage (\"C\", got);\n"
                                    "    ok += getmessage (\"trace\", \"C\", got);\n"
                                    "    Ci = got[0] + got[1] * ok;\n"
                                    "}\n",
                                    eh);
    ASSERT_FALSE(oso.empty()) << eh.firstError();
    EXPECT_NE(oso.find("\tsetmessage\t$const"), std::string::npos);
    EXPECT_NE(oso.find("\tgetmessage\t$tmp"), std::string::npos);
    EXPECT_NE(oso.find("%argrw{\"wrw\"}"), std::string::npos) << "the message lands in `got`";
}

TEST(LibraryOverloads, ClosureArrayLengthIsKnown) {
    CollectingHandler eh;
    std::string oso = compileOrFail("shader t (output float n = 0) {\n"
                                    "    closure color C[3];\n"
                                    "    n = arraylength (C);\n"
                                    "}\n",
                                    eh);
    ASSERT_FALSE(oso.empty()) << eh.firstError();
    EXPECT_NE(oso.find("\tarraylength\t"), std::string::npos);
}

TEST(LibraryOverloads, MessagesStillRefuseWrongArguments) {
    CollectingHandler eh;
    EXPECT_TRUE(
        compileOrFail("shader t () { closure color C[2]; setmessage (1, C); }\n", eh).empty());
    EXPECT_FALSE(eh.errors.empty());
    CollectingHandler eh2;
    EXPECT_TRUE(compileOrFail("shader t () { closure color C[2]; int x = getmessage (C); }\n", eh2)
                    .empty());
    EXPECT_FALSE(eh2.errors.empty());
}

} // namespace

// A cast chooses among overloads that differ only in their result: the colour noise, not the
// float one converted to grey.
TEST(LibraryOverloads, CastPicksTheOverloadReturningItsType) {
    CollectingHandler eh;
    std::string oso = compileOrFail("shader t (output color c = 0, output float f = 0) {\n"
                                    "    c = (color) noise (\"perlin\", P);\n"
                                    "    f = (float) noise (\"perlin\", P);\n"
                                    "}\n",
                                    eh);
    ASSERT_FALSE(oso.empty()) << eh.firstError();
    // The cast converts nothing, so each call writes its variable: the colour noise into the
    // colour, the float noise into the float.
    EXPECT_NE(oso.find("\tnoise\t\tc $const"), std::string::npos) << oso;
    EXPECT_NE(oso.find("\tnoise\t\tf $const"), std::string::npos) << oso;
    EXPECT_EQ(oso.find("\tassign\t"), std::string::npos) << oso;
}

// The type an assignment wants reaches the operands of arithmetic: `Cout = x * noise(P)` scales
// the colour noise, while a comparison's operands choose on their own.
TEST(LibraryOverloads, ArithmeticPassesTheWantedTypeToItsOperands) {
    CollectingHandler eh;
    std::string oso = compileOrFail("shader t (float x = 1, output color Cout = 0) {\n"
                                    "    Cout = x * noise (P);\n"
                                    "    float f = 2 * noise (P) + 1;\n"
                                    "    int big = noise (P) > 0.5;\n"
                                    "    Cout += f * big;\n"
                                    "}\n",
                                    eh);
    ASSERT_FALSE(oso.empty()) << eh.firstError();
    EXPECT_NE(oso.find("temp\tcolor\t$tmp1\t"), std::string::npos) << oso;
    EXPECT_NE(oso.find("\tnoise\t\t$tmp1 P"), std::string::npos) << oso;
    EXPECT_NE(oso.find("\tmul\t\tCout x $tmp1"), std::string::npos) << oso;
    // The other two calls stay float noise.
    size_t colorTemps = 0;
    for (size_t at = oso.find("temp\tcolor\t"); at != std::string::npos;
         at = oso.find("temp\tcolor\t", at + 1))
        ++colorTemps;
    EXPECT_EQ(colorTemps, 1u) << oso;
}
