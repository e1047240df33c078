// The preprocessor on its own: macros, conditionals, includes and line keeping.
#include "../../../osl/compiler/preprocessor.h"

#include <gtest/gtest.h>

namespace {

using OSL::pvt::Diagnostics;
using OSL::pvt::Preprocessor;

struct Capture : OSL::ErrorHandler {
    std::vector<std::string> errors;
    void operator()(int code, const std::string& msg) override {
        if (code == EH_ERROR) errors.push_back(msg);
    }
};

std::string run(const std::string& src, bool* ok = nullptr, Capture* cap = nullptr,
                std::vector<std::string> defs = {}) {
    Capture local;
    Diagnostics diag(cap ? cap : &local);
    Preprocessor pp(diag);
    for (const auto& d : defs) pp.defineFromOption(d);
    std::string out;
    bool r = pp.run(src, "t.osl", out);
    if (ok) *ok = r;
    return out;
}

// The text after the leading line marker, with runs of spaces collapsed.
std::string body(const std::string& out) {
    std::string s = out.substr(out.find('\n') + 1), r;
    for (char c : s) {
        if (c == ' ' && !r.empty() && r.back() == ' ') continue;
        if (c == '\n' && !r.empty() && r.back() == ' ' && r.size() > 1 && r[r.size() - 2] != '\n')
            r.pop_back();
        r += c;
    }
    return r;
}

TEST(Preprocessor, ObjectAndFunctionMacros) {
    EXPECT_EQ(body(run("#define N 4\n#define SQ(x) ((x)*(x))\nN SQ(a+1)\n")),
              "\n\n4 ((a+1)*(a+1))\n");
}

TEST(Preprocessor, StringizeAndPaste) {
    EXPECT_EQ(body(run("#define S(x) #x\n#define C(a,b) a##b\nS(hi there) C(foo,bar)\n")),
              "\n\n\"hi there\" foobar\n");
}

TEST(Preprocessor, VariadicMacros) {
    EXPECT_EQ(body(run("#define P(...) printf(\"%f\", __VA_ARGS__)\nP(u, v)\n")),
              "\nprintf(\"%f\", u, v)\n");
}

TEST(Preprocessor, RecursiveMacroStops) {
    EXPECT_EQ(body(run("#define foo foo + 1\nfoo\n")), "\nfoo + 1\n");
}

TEST(Preprocessor, ConditionalsWithDefinedAndArithmetic) {
    std::string src =
        "#define A 2\n#if defined(A) && A * 3 == 6\nyes\n#elif 1\nno\n#else\nno\n#endif\n"
        "#ifdef B\nno\n#endif\n#ifndef B\nyes2\n#endif\n";
    std::string out = body(run(src));
    EXPECT_NE(out.find("yes"), std::string::npos);
    EXPECT_NE(out.find("yes2"), std::string::npos);
    EXPECT_EQ(out.find("no"), std::string::npos);
}

TEST(Preprocessor, LinesAreKept) {
    std::string out = body(run("a\n#define X \\\n  1\n/* two\nlines */\nX __LINE__\n"));
    EXPECT_EQ(out, "a\n\n\n \n\n1 6\n");
}

TEST(Preprocessor, VersionMacrosArePredefined) {
    EXPECT_EQ(body(run("OSL_VERSION_MAJOR OSL_VERSION_MINOR OSL_VERSION_PATCH OSL_VERSION\n")),
              "1 12 13 11213\n");
}

TEST(Preprocessor, CommandLineDefinitions) {
    EXPECT_EQ(body(run("foo bar\n", nullptr, nullptr, {"foo=7", "bar"})), "7 1\n");
}

TEST(Preprocessor, ErrorDirectiveReportsItsLine) {
    Capture cap;
    bool ok = true;
    run("\n#error stop now\n", &ok, &cap);
    EXPECT_FALSE(ok);
    ASSERT_EQ(cap.errors.size(), 1u);
    EXPECT_EQ(cap.errors[0], "t.osl:2: error: #error stop now");
}

TEST(Preprocessor, MissingIncludeIsAnError) {
    Capture cap;
    bool ok = true;
    run("#include \"nonexistent_header_xyz.h\"\n", &ok, &cap);
    EXPECT_FALSE(ok);
    ASSERT_FALSE(cap.errors.empty());
}

TEST(Preprocessor, UnterminatedConditionalIsAnError) {
    bool ok = true;
    run("#if 1\nx\n", &ok);
    EXPECT_FALSE(ok);
}

TEST(Preprocessor, SelfIncludingMacroGrowthIsBounded) {
    // Each expansion doubles the text; the work bound stops it with an error instead of hanging.
    std::string src = "#define A B B\n#define B C C\n#define C D D\n#define D E E\n#define E F F\n"
                      "#define F G G\n#define G H H\n#define H I I\n#define I J J\n#define J K K\n"
                      "#define K L L\n#define L M M\n#define M N N\n#define N O O\n#define O P P\n"
                      "#define P Q Q\n#define Q R R\n#define R S S\n#define S T T\n#define T U U\n"
                      "#define U V V\n#define V W W\nA\n";
    bool ok = true;
    run(src, &ok);
    EXPECT_FALSE(ok);
}

} // namespace
