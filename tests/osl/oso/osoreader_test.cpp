// OSOReader: callback order and content for hand-written OSO, the struct registry fed from struct
// hints, and rejection of malformed text with a located message.
#include <OSL/osoreader.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

using namespace OSL;

namespace {

// Collects error messages instead of printing them.
class CollectingErrors final : public ErrorHandler {
public:
    void operator()(int errcode, const std::string& msg) override {
        if (errcode >= EH_ERROR) messages.push_back(msg);
    }
    std::vector<std::string> messages;
};

// Writes every callback as one line of text.
class RecordingReader : public OSOReader {
public:
    explicit RecordingReader(ErrorHandler* eh) : OSOReader(eh) {}
    void version(const char* specid, int major, int minor) override {
        log.push_back("version " + std::string(specid) + " " + std::to_string(major) + "." +
                      std::to_string(minor));
    }
    void shader(const char* type, const char* name) override {
        log.push_back("shader " + std::string(type) + " " + name);
    }
    void symbol(SymType st, TypeSpec t, const char* name) override {
        log.push_back("symbol " + std::to_string((int)st) + " " + t.string() + " " + name);
        types.push_back(t);
    }
    void symdefault(int d) override { log.push_back("int " + std::to_string(d)); }
    void symdefault(float d) override { log.push_back("float " + std::to_string(d)); }
    void symdefault(const char* d) override { log.push_back("string " + std::string(d)); }
    void parameter_done() override { log.push_back("parameter_done"); }
    void hint(string_view h) override { log.push_back("hint " + std::string(h)); }
    void codemarker(const char* name) override { log.push_back("code " + std::string(name)); }
    void codeend() override { log.push_back("codeend"); }
    void instruction(int label, const char* op) override {
        log.push_back("inst " + std::to_string(label) + " " + op);
    }
    void instruction_arg(const char* a) override { log.push_back("arg " + std::string(a)); }
    void instruction_jump(int j) override { log.push_back("jump " + std::to_string(j)); }
    void instruction_end() override { log.push_back("inst_end"); }

    std::vector<std::string> log;
    std::vector<TypeSpec> types;
};

const char* kSmall =
    "OpenShadingLanguage 1.00\n"
    "# Compiled by oslc 1.12.13.0\n"
    "surface small\t%meta{string,help,\"a # b\"} \n"
    "param\tfloat\tKd\t0.5\t\t%meta{float,min,0} %read{0,0} %write{2147483647,-1}\n"
    "oparam\tcolor\tCout\t1 0 0\t\t%read{2147483647,-1} %write{1,1}\n"
    "param\tstring[2]\tnames\t\"x y\" \"q\\\"z\"\t%read{1,1} %write{2147483647,-1}\n"
    "local\tfloat[]\tarr\n"
    "temp\tint\t$tmp1\n"
    "const\tfloat\t$const1\t-inf\n"
    "\n"
    "code Kd\n"
    "\tassign\t\tKd $const1 \t%line{3} %argrw{\"wr\"}\n"
    "code ___main___\n"
    "# small.osl:4\n"
    "7:\tif\t\t$tmp1 2 3 \t%line{4}\n"
    "\tend\n";

TEST(OSOReader, CallbacksFollowFileOrderWithDefaultsHintsAndJumps) {
    CollectingErrors errors;
    RecordingReader r(&errors);
    ASSERT_TRUE(r.parse_memory(kSmall));
    EXPECT_TRUE(errors.messages.empty());
    const std::vector<std::string> want = {
        "version OpenShadingLanguage 1.0",
        "shader surface small",
        "hint %meta{string,help,\"a # b\"}",
        "symbol 0 float Kd",
        "float 0.500000",
        "hint %meta{float,min,0}",
        "hint %read{0,0}",
        "hint %write{2147483647,-1}",
        "parameter_done",
        "symbol 1 color Cout",
        "int 1",
        "int 0",
        "int 0",
        "hint %read{2147483647,-1}",
        "hint %write{1,1}",
        "parameter_done",
        "symbol 0 string[2] names",
        "string x y",
        "string q\"z",
        "hint %read{1,1}",
        "hint %write{2147483647,-1}",
        "parameter_done",
        "symbol 2 float[] arr",
        "symbol 3 int $tmp1",
        "symbol 5 float $const1",
        "float -inf",
        "code Kd",
        "inst -1 assign",
        "arg Kd",
        "arg $const1",
        "hint %line{3}",
        "hint %argrw{\"wr\"}",
        "inst_end",
        "code ___main___",
        "inst 7 if",
        "arg $tmp1",
        "jump 2",
        "jump 3",
        "hint %line{4}",
        "inst_end",
        "inst -1 end",
        "inst_end",
        "codeend",
    };
    EXPECT_EQ(r.log, want);
    ASSERT_GE(r.types.size(), 4u);
    EXPECT_TRUE(r.types[3].is_unsized_array());
    EXPECT_EQ(r.types[3].elementtype().simpletype(), TypeDesc::TypeFloat);
}

TEST(OSOReader, ClosureAndArrayTypes) {
    CollectingErrors errors;
    RecordingReader r(&errors);
    ASSERT_TRUE(r.parse_memory("OpenShadingLanguage 1.00\nshader s\n"
                               "oparam\tclosure color\tc\n"
                               "param\tclosure color[3]\tca\n"
                               "param\tmatrix[2]\tm\t1 0 0 0 0 1 0 0 0 0 1 0 0 0 0 1 2\n"
                               "code ___main___\n\tend\n"));
    ASSERT_EQ(r.types.size(), 3u);
    EXPECT_TRUE(r.types[0].is_closure());
    EXPECT_EQ(r.types[0].simpletype(), TypeDesc::PTR);
    EXPECT_EQ(r.types[0].string(), "closure color");
    EXPECT_TRUE(r.types[1].is_closure_array());
    EXPECT_EQ(r.types[1].string(), "closure color[3]");
    EXPECT_EQ(r.types[2].string(), "matrix[2]");
    EXPECT_EQ(r.types[2].arraylength(), 2);
}

TEST(OSOReader, StructSymbolsRegisterTheirFieldsIncludingNestedStructs) {
    CollectingErrors errors;
    RecordingReader r(&errors);
    ASSERT_TRUE(r.parse_memory(
        "OpenShadingLanguage 1.00\nshader nest\n"
        "param\tstruct Outer\to\t\t%struct{\"Outer\"} %structfields{in,f} "
        "%structfieldtypes{\"S7f[2]\"} %structnfields{2}\n"
        "param\tstruct Inner\to.in\t\t%struct{\"Inner\"} %structfields{a,b} "
        "%structfieldtypes{\"cC\"} %structnfields{2} %mystruct{o} %mystructfield{0}\n"
        "param\tcolor\to.in.a\t1 1 1\n"
        "param\tclosure color\to.in.b\n"
        "param\tfloat[2]\to.f\t1 2\n"
        "code ___main___\n\tend\n"));
    ASSERT_EQ(r.types.size(), 5u);
    const TypeSpec outer = r.types[0], inner = r.types[1];
    ASSERT_TRUE(outer.is_structure());
    ASSERT_TRUE(inner.is_structure());
    EXPECT_EQ(outer.string(), "struct nest_Outer");
    const StructSpec* os = outer.structspec();
    ASSERT_NE(os, nullptr);
    ASSERT_EQ(os->numfields(), 2);
    EXPECT_EQ(os->field(0).name, "in");
    EXPECT_EQ(os->field(0).type, inner);
    EXPECT_EQ(os->field(1).type.string(), "float[2]");
    EXPECT_EQ(os->lookup_field(ustring("f")), 1);
    EXPECT_EQ(os->lookup_field(ustring("zz")), -1);
    const StructSpec* is = inner.structspec();
    ASSERT_EQ(is->numfields(), 2);
    EXPECT_EQ(is->field(0).type, TypeSpec(TypeDesc::TypeColor));
    EXPECT_TRUE(is->field(1).type.is_closure());

    // Reading the same shader again finds the same registered structs.
    RecordingReader again(&errors);
    ASSERT_TRUE(again.parse_memory(
        "OpenShadingLanguage 1.00\nshader nest\n"
        "param\tstruct Inner\tx\t\t%structfields{a,b} %structfieldtypes{\"cC\"}\n"
        "code ___main___\n\tend\n"));
    EXPECT_EQ(again.types[0], inner);

    // A different layout under the same name gets a struct of its own.
    RecordingReader other(&errors);
    ASSERT_TRUE(
        other.parse_memory("OpenShadingLanguage 1.00\nshader nest\n"
                           "param\tstruct Inner\tx\t\t%structfields{a} %structfieldtypes{\"f\"}\n"
                           "code ___main___\n\tend\n"));
    EXPECT_NE(other.types[0], inner);
    EXPECT_EQ(other.types[0].structspec()->numfields(), 1);
    EXPECT_TRUE(equivalent(outer, outer));
    EXPECT_FALSE(equivalent(inner, other.types[0]));
}

TEST(OSOReader, ReadersThatWantOnlyParametersStopEarly) {
    struct ParamsOnly : RecordingReader {
        using RecordingReader::RecordingReader;
        bool stop_parsing_at_temp_symbols() override { return true; }
    };
    struct NoCode : RecordingReader {
        using RecordingReader::RecordingReader;
        bool parse_code_section() override { return false; }
    };
    CollectingErrors errors;
    ParamsOnly p(&errors);
    ASSERT_TRUE(p.parse_memory(kSmall));
    EXPECT_EQ(p.log.back(), "symbol 2 float[] arr");
    NoCode n(&errors);
    ASSERT_TRUE(n.parse_memory(kSmall));
    EXPECT_EQ(n.log.back(), "float -inf");
}

TEST(OSOReader, ParseFileReadsAFileAndReportsAMissingOne) {
    const auto path = std::filesystem::temp_directory_path() / "osoreader_test_small.oso";
    {
        std::ofstream out(path);
        out << kSmall;
    }
    CollectingErrors errors;
    RecordingReader r(&errors);
    EXPECT_TRUE(r.parse_file(path.string()));
    EXPECT_EQ(r.log.back(), "codeend");
    std::filesystem::remove(path);

    RecordingReader missing(&errors);
    EXPECT_FALSE(missing.parse_file(path.string()));
    ASSERT_EQ(errors.messages.size(), 1u);
    EXPECT_NE(errors.messages[0].find(path.string()), std::string::npos);
}

struct BadCase {
    const char* what;
    std::string text;
    int line;
};

TEST(OSOReader, MalformedTextIsRejectedWithItsLineAndNoCallbacks) {
    const std::string head = "OpenShadingLanguage 1.00\nshader s\n";
    const std::string tail = "code ___main___\n\tend\n";
    const std::vector<BadCase> cases = {
        {"empty", "", 0},
        {"no version number", "OpenShadingLanguage\nshader s\n" + tail, 1},
        {"no shader name", "OpenShadingLanguage 1.00\nshader\n" + tail, 2},
        {"unknown type", head + "param\tfloot\tx\n" + tail, 3},
        {"missing name", head + "param\tfloat\n" + tail, 3},
        {"unterminated string", head + "param\tstring\tx\t\"abc\n" + tail, 3},
        {"unterminated hint", head + "param\tfloat\tx\t1\t%meta{float,a,1\n" + tail, 3},
        {"zero array length", head + "param\tfloat[0]\tx\n" + tail, 3},
        {"huge array length", head + "param\tfloat[2000000000]\tx\n" + tail, 3},
        {"unclosed array", head + "param\tfloat[3\tx\n" + tail, 3},
        {"integer out of range", head + "param\tint\tx\t99999999999\n" + tail, 3},
        {"value after hints", head + "param\tint\tx\t%read{1,1} 3\n" + tail, 3},
        {"stray character", head + "param\tint\tx\t1 @\n" + tail, 3},
        {"symbol after code", head + "code a\n\tend\nlocal\tint\tx\n", 5},
        {"instruction before code", head + "\tadd\ta b c\n" + tail, 3},
        {"no code", head + "param\tint\tx\t1\n", 3},
        {"code without end", head + "code ___main___\n\tassign\tx y\n", 4},
        {"argument after jump", head + "code ___main___\n\tif\tc 1 2 d\n\tend\n", 4},
        {"label without colon", head + "code ___main___\n\t3\tassign\tx y\n\tend\n", 4},
        {"NUL byte", head + std::string("param\tint\tx\0\n", 13) + tail, 3},
    };
    for (const BadCase& c : cases) {
        CollectingErrors errors;
        RecordingReader r(&errors);
        EXPECT_FALSE(r.parse_memory(c.text)) << c.what;
        EXPECT_TRUE(r.log.empty()) << c.what;
        ASSERT_EQ(errors.messages.size(), 1u) << c.what;
        const std::string where = "<buffer>:" + std::to_string(c.line) + ": error: ";
        EXPECT_EQ(errors.messages[0].rfind(where, 0), 0u) << c.what << ": " << errors.messages[0];
    }
}

TEST(OSOReader, CarriageReturnsAndCommentsAreIgnored) {
    CollectingErrors errors;
    RecordingReader r(&errors);
    ASSERT_TRUE(r.parse_memory("OpenShadingLanguage 1.00\r\n# comment\r\nshader s # trailing\r\n"
                               "const\tstring\t$c\t\"#not a comment\"\r\ncode ___main___\r\n"
                               "\tend\r\n"));
    EXPECT_EQ(r.log[2], "symbol 5 string $c");
    EXPECT_EQ(r.log[3], "string #not a comment");
}

} // namespace
