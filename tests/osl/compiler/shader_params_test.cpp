// Shader parameters as the OSO declares them: unsized arrays keep their `T[]` type and take
// their length from the default.
#include "compiler_test_support.h"

#include <gtest/gtest.h>

#include <string>

using compiler_test::CollectingHandler;
using compiler_test::compileOrFail;

namespace {

TEST(ShaderParams, UnsizedArrayIsWrittenUnsizedWithAllDefaults) {
    CollectingHandler eh;
    std::string oso = compileOrFail(
        "shader t (float fu[] = {1, 2, 3}, color ca[] = { color(1), color(0, 1, 0) },\n"
        "          string su[] = {\"x\"}, output float o = 0) {\n"
        "    o = fu[2] + ca[1][1] + arraylength (fu);\n"
        "}\n",
        eh);
    ASSERT_FALSE(oso.empty()) << eh.firstError();
    EXPECT_NE(oso.find("param\tfloat[]\tfu\t1 2 3\t\t"), std::string::npos) << oso;
    EXPECT_NE(oso.find("param\tcolor[]\tca\t1 1 1 0 1 0\t\t"), std::string::npos) << oso;
    EXPECT_NE(oso.find("param\tstring[]\tsu\t\"x\"\t\t"), std::string::npos) << oso;
}

TEST(ShaderParams, UnsizedArrayWithComputedDefaultStaysUnsized) {
    CollectingHandler eh;
    std::string oso =
        compileOrFail("shader t (float fu[] = { u, v }, output float o = 0) { o = fu[1]; }\n", eh);
    ASSERT_FALSE(oso.empty()) << eh.firstError();
    EXPECT_NE(oso.find("param\tfloat[]\tfu\t"), std::string::npos) << oso;
    EXPECT_NE(oso.find("code fu\n"), std::string::npos) << oso;
}

TEST(ShaderParams, SizedArrayKeepsItsLength) {
    CollectingHandler eh;
    std::string oso =
        compileOrFail("shader t (float f[4] = {1, 2}, output float o = 0) { o = f[3]; }\n", eh);
    ASSERT_FALSE(oso.empty()) << eh.firstError();
    EXPECT_NE(oso.find("param\tfloat[4]\tf\t1 2 0 0\t\t"), std::string::npos) << oso;
}

} // namespace
