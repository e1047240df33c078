// Shader parameters as the OSO declares them: unsized arrays keep their `T[]` type and take
// their length from the default.
#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

struct Errors : OSL::ErrorHandler {
    std::vector<std::string> errors;
    void operator()(int code, const std::string& msg) override {
        if (code == EH_ERROR || code == EH_SEVERE) errors.push_back(msg);
    }
};

std::string compileOrFail(const std::string& src, Errors& eh) {
    OSL::OSLCompiler c(&eh);
    std::string oso;
    if (!c.compile_buffer(src, oso, {}, "", "test.osl")) return "";
    return oso;
}

TEST(ShaderParams, UnsizedArrayIsWrittenUnsizedWithAllDefaults) {
    Errors eh;
    std::string oso = compileOrFail(
        "shader t (float fu[] = {1, 2, 3}, color ca[] = { color(1), color(0, 1, 0) },\n"
        "          string su[] = {\"x\"}, output float o = 0) {\n"
        "    o = fu[2] + ca[1][1] + arraylength (fu);\n"
        "}\n",
        eh);
    ASSERT_FALSE(oso.empty()) << (eh.errors.empty() ? "" : eh.errors[0]);
    EXPECT_NE(oso.find("param\tfloat[]\tfu\t1 2 3\t\t"), std::string::npos) << oso;
    EXPECT_NE(oso.find("param\tcolor[]\tca\t1 1 1 0 1 0\t\t"), std::string::npos) << oso;
    EXPECT_NE(oso.find("param\tstring[]\tsu\t\"x\"\t\t"), std::string::npos) << oso;
}

TEST(ShaderParams, UnsizedArrayWithComputedDefaultStaysUnsized) {
    Errors eh;
    std::string oso =
        compileOrFail("shader t (float fu[] = { u, v }, output float o = 0) { o = fu[1]; }\n", eh);
    ASSERT_FALSE(oso.empty()) << (eh.errors.empty() ? "" : eh.errors[0]);
    EXPECT_NE(oso.find("param\tfloat[]\tfu\t"), std::string::npos) << oso;
    EXPECT_NE(oso.find("code fu\n"), std::string::npos) << oso;
}

TEST(ShaderParams, SizedArrayKeepsItsLength) {
    Errors eh;
    std::string oso =
        compileOrFail("shader t (float f[4] = {1, 2}, output float o = 0) { o = f[3]; }\n", eh);
    ASSERT_FALSE(oso.empty()) << (eh.errors.empty() ? "" : eh.errors[0]);
    EXPECT_NE(oso.find("param\tfloat[4]\tf\t1 2 0 0\t\t"), std::string::npos) << oso;
}

} // namespace
