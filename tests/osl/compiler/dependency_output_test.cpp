// The make rules -MD / -MMD / -MF / -MT write: the shader's own file and every header it read.
#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace {

namespace fs = std::filesystem;

class DependencyOutput : public ::testing::Test {
protected:
    void SetUp() override {
        dir = fs::temp_directory_path() /
              ("tessel-deps-test-" + std::to_string(::getpid()) + "-" +
               ::testing::UnitTest::GetInstance()->current_test_info()->name());
        fs::create_directories(dir);
        write("myheader.h", "int foo (int x) { return x * 2; }\n");
        write("test.osl", "#include \"myheader.h\"\n#include \"color2.h\"\n"
                          "shader test () { int bar = foo (42); printf (\"%d\\n\", bar); }\n");
        saved = fs::current_path();
        fs::current_path(dir);
    }
    void TearDown() override {
        fs::current_path(saved);
        std::error_code ec;
        fs::remove_all(dir, ec);
    }
    void write(const std::string& name, const std::string& text) {
        std::ofstream(dir / name) << text;
    }
    static std::string read(const std::string& name) {
        std::ifstream in(name);
        std::stringstream ss;
        ss << in.rdbuf();
        return ss.str();
    }
    bool compile(const std::vector<std::string>& options) {
        OSL::OSLCompiler c;
        return c.compile("test.osl", options);
    }
    fs::path dir, saved;
};

TEST_F(DependencyOutput, MMDWritesUserHeadersBesideTheOutput) {
    ASSERT_TRUE(compile({"-q", "-MMD"}));
    EXPECT_EQ(read("test.d"), "test.oso: test.osl \\\n  myheader.h\n");
    EXPECT_TRUE(fs::exists("test.oso"));
}

TEST_F(DependencyOutput, MFAndMTChooseFileAndTarget) {
    ASSERT_TRUE(compile({"-q", "-MMD", "-MF", "mycustom.d", "-MT", "customtarget"}));
    EXPECT_EQ(read("mycustom.d"), "customtarget: test.osl \\\n  myheader.h\n");
    ASSERT_TRUE(compile({"-q", "-MMD", "-MFmydep.d"}));
    EXPECT_EQ(read("mydep.d"), "test.oso: test.osl \\\n  myheader.h\n");
}

TEST_F(DependencyOutput, MDListsTheStandardHeadersToo) {
    fs::create_directories("out");
    ASSERT_TRUE(compile({"-q", "-MD", "-o", "out/x.oso"}));
    std::string d = read("out/x.d");
    EXPECT_EQ(d.rfind("out/x.oso: test.osl \\\n", 0), 0u) << d;
    EXPECT_NE(d.find("stdosl.h"), std::string::npos) << d;
    EXPECT_NE(d.find("  myheader.h"), std::string::npos) << d;
    EXPECT_NE(d.find("  color2.h"), std::string::npos) << d;
}

TEST_F(DependencyOutput, MMPrintsTheRuleInsteadOfCompiling) {
    ::testing::internal::CaptureStdout();
    bool ok = compile({"-MM"});
    std::string printed = ::testing::internal::GetCapturedStdout();
    ASSERT_TRUE(ok);
    EXPECT_EQ(printed, "test.oso: test.osl \\\n  myheader.h\n");
    EXPECT_FALSE(fs::exists("test.oso"));
}

TEST_F(DependencyOutput, NoRuleWithoutTheOption) {
    ASSERT_TRUE(compile({"-q"}));
    EXPECT_FALSE(fs::exists("test.d"));
}

} // namespace

// oslc names the bytecode after the shader it holds, not after the source file.
TEST_F(DependencyOutput, OutputIsNamedAfterTheShader) {
    write("source_name.osl", "shader declared_name () { }\n");
    OSL::OSLCompiler c;
    ASSERT_TRUE(c.compile("source_name.osl", {"-q"}));
    EXPECT_EQ(c.output_filename(), "declared_name.oso");
    EXPECT_TRUE(fs::exists("declared_name.oso"));
    EXPECT_FALSE(fs::exists("source_name.oso"));
}

// The rule and its file follow the bytecode's name, so they name the shader too.
TEST_F(DependencyOutput, RuleIsNamedAfterTheShader) {
    write("source_name.osl", "#include \"myheader.h\"\nshader declared_name () { }\n");
    OSL::OSLCompiler c;
    ASSERT_TRUE(c.compile("source_name.osl", {"-q", "-MMD"}));
    EXPECT_FALSE(fs::exists("source_name.d"));
    EXPECT_EQ(read("declared_name.d"), "declared_name.oso: source_name.osl \\\n  myheader.h\n");
    // An explicit output keeps its own name.
    ASSERT_TRUE(c.compile("source_name.osl", {"-q", "-MMD", "-o", "given.oso"}));
    EXPECT_EQ(read("given.d"), "given.oso: source_name.osl \\\n  myheader.h\n");
}

TEST_F(DependencyOutput, FailedCompileWritesNoRule) {
    write("broken.osl", "shader broken () { undefined_name = 1; }\n");
    OSL::OSLCompiler c;
    ASSERT_FALSE(c.compile("broken.osl", {"-q", "-MMD"}));
    EXPECT_FALSE(fs::exists("broken.d"));
}
