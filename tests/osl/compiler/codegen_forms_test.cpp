// Pins the op sequences the compiler writes for constructs whose form follows oslc's: casts and
// constructors, component and array-element stores, comparisons, loops and conditions, output
// arguments, struct values written in place, and the %argderivs hints on derivative-taking ops.
#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <regex>
#include <sstream>
#include <string>
#include <vector>

namespace {

struct Handler : OSL::ErrorHandler {
    std::vector<std::string> errors;
    void operator()(int code, const std::string& msg) override {
        if (code == EH_ERROR || code == EH_SEVERE) errors.push_back(msg);
    }
};

std::string compileOso(const std::string& src) {
    Handler eh;
    OSL::OSLCompiler c(&eh);
    std::string oso;
    bool ok = c.compile_buffer(src, oso, {}, "", "forms.osl");
    EXPECT_TRUE(ok) << (eh.errors.empty() ? src : eh.errors[0]);
    return oso;
}

// The ops of one code section as "name arg arg ...", temporaries and constants numbered away
// ($tmp, $const) and scope prefixes dropped, so a test names the form rather than the numbering.
std::vector<std::string> sectionOps(const std::string& oso, const std::string& section) {
    std::vector<std::string> ops;
    std::istringstream in(oso);
    std::string line;
    bool inside = false;
    static const std::regex tmp(R"(\$tmp\d+)"), cst(R"(\$const\d+)"), scope(R"(___\d+_)");
    while (std::getline(in, line)) {
        if (line.rfind("code ", 0) == 0) {
            inside = line == "code " + section;
            continue;
        }
        if (!inside || line.empty() || line[0] != '\t') continue;
        std::istringstream fields(line);
        std::string word, op;
        while (fields >> word) {
            if (word[0] == '%') break;
            if (std::isdigit(static_cast<unsigned char>(word[0]))) continue; // jump targets
            op += (op.empty() ? "" : " ") + word;
        }
        op = std::regex_replace(op, tmp, "$$tmp");
        op = std::regex_replace(op, cst, "$$const");
        ops.push_back(std::regex_replace(op, scope, ""));
    }
    return ops;
}

std::vector<std::string> mainOps(const std::string& src) {
    return sectionOps(compileOso(src), "___main___");
}

using Ops = std::vector<std::string>;

// The hints written on the first op line that starts with `prefix`.
std::string hintsOf(const std::string& oso, const std::string& prefix) {
    std::istringstream in(oso);
    std::string line;
    while (std::getline(in, line))
        if (line.rfind("\t" + prefix, 0) == 0) {
            size_t h = line.find('%');
            return h == std::string::npos ? "" : line.substr(h);
        }
    ADD_FAILURE() << "no op line starting with " << prefix << " in\n" << oso;
    return "";
}

TEST(CodegenForms, CastToTheSameTypeIsNoOp) {
    EXPECT_EQ(mainOps("shader t (output color C = 0) { C = (float) noise(u); }"),
              (Ops{"noise $tmp u", "assign C $tmp", "end"}));
    EXPECT_EQ(mainOps("shader t (output float f = 0) { f = float(u * 2); }"),
              (Ops{"mul f u $const", "end"}));
}

TEST(CodegenForms, FloatConstructorConvertsItsIntArgumentThenCopies) {
    EXPECT_EQ(mainOps("shader t (int i = 1, output float f = 0) { f = float(i); }"),
              (Ops{"assign $tmp i", "assign f $tmp", "end"}));
    // A cast converts once.
    EXPECT_EQ(mainOps("shader t (int i = 1, output float f = 0) { f = (float) i; }"),
              (Ops{"assign f i", "end"}));
    // int() of a float is a single conversion.
    EXPECT_EQ(mainOps("shader t (output int i = 0) { i = int(u); }"), (Ops{"assign i u", "end"}));
}

TEST(CodegenForms, ComponentStoresTakeIntsUnconverted) {
    EXPECT_EQ(mainOps("shader t (int i = 1, output color c = 0, output matrix m = 1)"
                      " { c[1] = i; m[0][1] = i; c[2] = u; }"),
              (Ops{"compassign c $const i", "mxcompassign m $const $const i",
                   "compassign c $const u", "end"}));
}

TEST(CodegenForms, NumberIntoTripleArrayElementIsWidenedByAssign) {
    EXPECT_EQ(mainOps("shader t (output color o = 0)"
                      " { color a[2] = { color(1, 2, 3), 0.5 }; o = a[1]; }"),
              (Ops{"aassign a $const $const", "assign $tmp $const", "aassign a $const $tmp",
                   "aref o a $const", "end"}));
}

TEST(CodegenForms, NumberIntoNumberArrayElementIsStoredAsItIs) {
    EXPECT_EQ(mainOps("shader t (int i = 1, output float o = 0)"
                      " { float a[2] = { u, 2 }; a[1] = i; int b[2] = { i, 3 }; b[0] = u;"
                      " o = a[1] + b[0]; }"),
              (Ops{"aassign a $const u", "aassign a $const $const", "aassign a $const i",
                   "aassign b $const i", "aassign b $const $const", "aassign b $const u",
                   "aref $tmp a $const", "aref $tmp b $const", "assign $tmp $tmp",
                   "add o $tmp $tmp", "end"}));
}

TEST(CodegenForms, TripleInitListOfConstantsIsOneConstant) {
    EXPECT_EQ(mainOps("shader t (output normal n = 0) { n = normal(1); normal m = {0, 1, 0};"
                      " n += m; }"),
              (Ops{"assign n $const", "assign m $const", "add n n m", "end"}));
}

TEST(CodegenForms, ComparisonsTakeMixedOperandsAsTheyAre) {
    EXPECT_EQ(mainOps("shader t (int i = 1, output int r = 0) { r = i < 0.5; r = u == 10; }"),
              (Ops{"lt r i $const", "eq r u $const", "end"}));
    // Arithmetic still meets an int as a float.
    EXPECT_EQ(mainOps("shader t (int i = 1, output float f = 0) { f = i + u; }"),
              (Ops{"assign $tmp i", "add f $tmp u", "end"}));
}

TEST(CodegenForms, LoopWithoutConditionTestsConstantOne) {
    EXPECT_EQ(mainOps("shader t () { for (;;) { break; } }"),
              (Ops{"for $tmp", "neq $tmp $const $const", "break", "end"}));
}

TEST(CodegenForms, ClosureConditionIsComparedWithZero) {
    EXPECT_EQ(mainOps("shader t (output closure color c = 0) { if (c) printf(\"x\"); }"),
              (Ops{"neq $tmp c $const", "if $tmp", "printf $const", "end"}));
}

TEST(CodegenForms, ClosureParameterDefaultZeroNeedsNoCode) {
    std::string oso = compileOso("shader t (closure color c = 0, output closure color o = 0)"
                                 " { o = c; }");
    EXPECT_EQ(oso.find("code c\n"), std::string::npos) << oso;
    EXPECT_EQ(oso.find("code o\n"), std::string::npos) << oso;
    EXPECT_EQ(oso.find("%initexpr"), std::string::npos) << oso;
}

TEST(CodegenForms, ElementPassedAsOutputArgumentIsWorkedOnInItsTemporary) {
    EXPECT_EQ(mainOps("void one(output float x) { x = 1; }\n"
                      "shader t (output float o = 0) { float a[2] = {0, 0}; one(a[1]);"
                      " o = a[1]; }"),
              (Ops{"assign a $const", "aref $tmp a $const", "functioncall $const",
                   "assign $tmp $const", "aassign a $const $tmp", "aref o a $const", "end"}));
}

const char* kPair =
    "struct pair { float a; float b; };\n"
    "pair __operator__add__(pair x, pair y) { return pair(x.a + y.a, x.b + y.b); }\n";

TEST(CodegenForms, StructConstructorAndOperatorResultLandInPlace) {
    EXPECT_EQ(mainOps(std::string(kPair) +
                      "shader t (output float o = 0) { pair p = pair(u, v * 2); pair q = p + p;"
                      " o = q.b; }"),
              (Ops{"assign p.a u", "mul p.b v $const", "functioncall $const", "add q.a p.a p.a",
                   "add q.b p.b p.b", "assign o q.b", "end"}));
}

TEST(CodegenForms, StructUnaryOperatorResultLandsInPlace) {
    EXPECT_EQ(mainOps(std::string(kPair) +
                      "pair __operator__neg__(pair x) { return pair(-x.a, -x.b); }\n"
                      "shader t (output float o = 0) { pair p = pair(u, v); pair q = -p;"
                      " o = q.b; }"),
              (Ops{"assign p.a u", "assign p.b v", "functioncall $const", "neg q.a p.a",
                   "neg q.b p.b", "assign o q.b", "end"}));
}

TEST(CodegenForms, StructReadWhileRebuiltGoesThroughATemporary) {
    // Writing p.a first would change what p.b is built from.
    EXPECT_EQ(mainOps(std::string(kPair) +
                      "shader t (output float o = 0) { pair p = pair(u, v); p = pair(p.b, p.a);"
                      " o = p.b; }"),
              (Ops{"assign p.a u", "assign p.b v", "assign $tmp.a p.b", "assign $tmp.b p.a",
                   "assign p.a $tmp.a", "assign p.b $tmp.b", "assign o p.b", "end"}));
    // An operand of the operator is the destination itself.
    Ops ops = mainOps(std::string(kPair) +
                      "shader t (output float o = 0) { pair p = pair(u, v); p = p + p; o = p.b; }");
    ASSERT_GE(ops.size(), 5u);
    EXPECT_EQ(ops[3], "add $tmp.a p.a p.a");
    EXPECT_EQ(ops[4], "add $tmp.b p.b p.b");
}

TEST(CodegenForms, DerivativeTakingOpsCarryArgderivs) {
    std::string oso =
        compileOso("shader t (string f = \"a.tx\", output color c = 0, output float x = 0) {\n"
                   "  c = texture(f, u, v);\n"
                   "  c += texture(f, v, u, 0, 0, 0, 0);\n"
                   "  c += environment(f, I);\n"
                   "  x = Dx(u) + filterwidth(v) + area(P);\n"
                   "  x += noise(\"perlin\", P, u);\n"
                   "  x += pnoise(\"perlin\", P, u, point(4), 4.0);\n"
                   "  x += noise(\"gabor\", P, \"bandwidth\", 2.0);\n"
                   "  x += snoise(P);\n"
                   "}\n");
    EXPECT_NE(hintsOf(oso, "texture\t\tc f u v").find("%argderivs{2,3}"), std::string::npos);
    EXPECT_EQ(hintsOf(oso, "texture\t\t$tmp").find("%argderivs"), std::string::npos);
    EXPECT_NE(hintsOf(oso, "environment").find("%argderivs{2}"), std::string::npos);
    EXPECT_NE(hintsOf(oso, "Dx").find("%argderivs{1}"), std::string::npos);
    EXPECT_NE(hintsOf(oso, "filterwidth").find("%argderivs{1}"), std::string::npos);
    EXPECT_NE(hintsOf(oso, "area").find("%argderivs{1}"), std::string::npos);
    EXPECT_NE(hintsOf(oso, "noise\t\t$tmp").find("%argderivs{2,3}"), std::string::npos);
    EXPECT_NE(hintsOf(oso, "pnoise").find("%argderivs{2,3,4,5}"), std::string::npos);
    EXPECT_EQ(hintsOf(oso, "snoise").find("%argderivs"), std::string::npos);
    // Only the position of a gabor noise, not its option values.
    size_t gabor = oso.find("\"gabor\"");
    ASSERT_NE(gabor, std::string::npos);
    std::regex gaborLine(R"(\tnoise\t\t\S+ \S+ \S+ \S+ \S+ \t.*%argderivs\{2\})");
    EXPECT_TRUE(std::regex_search(oso, gaborLine)) << oso;
}

} // namespace

namespace {

// The declaration line of `name` in the OSO, or "" when there is none.
std::string symbolLine(const std::string& oso, const std::string& name) {
    std::istringstream in(oso);
    std::string line;
    while (std::getline(in, line)) {
        std::istringstream words(line);
        std::string kind, type, sym;
        words >> kind >> type >> sym;
        if (type == "struct") words >> sym;
        if ((kind == "param" || kind == "oparam") && sym == name) return line;
    }
    return "";
}

TEST(CodegenForms, NestedStructDefaultsKeepConstantLeavesAndComputeTheRest) {
    const std::string oso = compileOso(R"(
struct Inner { int i; float f; };
struct Outer { Inner a; color c; int arr[2]; };
shader t (Outer o = { { 3, 2.5 }, color(0.25, 0.5, 0.75), { 4, 5 } },
          Outer w = { { 1 + 2, 2.5 }, color(u, 0.5, 0.75), { 4, 5 } },
          output float out = 0) {
    out = o.a.f + w.a.f;
}
)");
    // Constant leaves of nested lists are defaults, with no code.
    EXPECT_NE(symbolLine(oso, "o.a.i").find("\t3\t"), std::string::npos) << oso;
    EXPECT_NE(symbolLine(oso, "o.a.f").find("\t2.5\t"), std::string::npos) << oso;
    EXPECT_NE(symbolLine(oso, "o.c").find("\t0.25 0.5 0.75\t"), std::string::npos) << oso;
    EXPECT_EQ(symbolLine(oso, "o.a.i").find("%initexpr"), std::string::npos);
    EXPECT_TRUE(sectionOps(oso, "o.a.i").empty());
    // An array leaf is computed by a section of its own, as is every non-constant leaf.
    EXPECT_FALSE(sectionOps(oso, "o.arr").empty()) << oso;
    EXPECT_FALSE(sectionOps(oso, "w.a.i").empty()) << oso;
    EXPECT_FALSE(sectionOps(oso, "w.c").empty()) << oso;
    EXPECT_TRUE(sectionOps(oso, "w.a.f").empty()) << oso;
    EXPECT_NE(symbolLine(oso, "w.a.f").find("\t2.5\t"), std::string::npos) << oso;
    // The computed colour starts from its constant components.
    EXPECT_NE(symbolLine(oso, "w.c").find("\t0 0.5 0.75\t"), std::string::npos) << oso;
}

TEST(CodegenForms, ConstantArrayLeafOfAStructDefaultIsOneConstant) {
    const std::string oso = compileOso(R"(
struct S { float f; int arr[3]; };
shader t (S s = { 1, { 4, 5, 6 } }, S w = { 2, { 7, int(u), 9 } }, output float out = 0) {
    out = s.f + w.f;
}
)");
    EXPECT_EQ(sectionOps(oso, "s.arr"), (Ops{"assign s.arr $const"}));
    // An element computed by code: every element is stored straight into the field.
    EXPECT_EQ(sectionOps(oso, "w.arr"),
              (Ops{"aassign w.arr $const $const", "assign $tmp u", "aassign w.arr $const $tmp",
                   "aassign w.arr $const $const"}));
}

TEST(CodegenForms, FieldOfAStructArrayElementIsReadBeforeItIsWritten) {
    const char* decl = "struct ray { point pos; float w; };\n";
    EXPECT_EQ(
        mainOps(std::string(decl) + "shader t (int i = 1, output float o = 0)"
                                    " { ray r[2]; r[i].w = u * 2; r[0].pos = point(1, 2, 3);"
                                    " o = r[1].w; }"),
        (Ops{"aref $tmp r.w i", "mul $tmp u $const", "aassign r.w i $tmp", "aref $tmp r.pos $const",
             "aassign r.pos $const $const", "aref o r.w $const", "end"}));
    // A plain array element, or an array field of a plain struct, is stored directly.
    EXPECT_EQ(mainOps("struct S { int a[2]; };\n"
                      "shader t (int i = 1, output float o = 0) { S s; float f[2]; f[i] = u;"
                      " s.a[i] = 3; o = f[1] + s.a[0]; }"),
              (Ops{"aassign f i u", "aassign s.a i $const", "aref $tmp f $const",
                   "aref $tmp s.a $const", "assign $tmp $tmp", "add o $tmp $tmp", "end"}));
}

TEST(CodegenForms, StructValuesAreStoredFieldByFieldIntoTheirPlace) {
    const char* decls = "struct C4 { color rgb; float a; };\n"
                        "struct Nest { C4 c; float k; };\n";
    // Into array elements: each field goes straight into its element.
    EXPECT_EQ(mainOps(std::string(decls) +
                      "shader t (output float o = 0) { C4 arr[2] = { C4(color(1, 2, 3), u),"
                      " { 0.5, 2 } }; o = arr[1].a; }"),
              (Ops{"aassign arr.rgb $const $const", "aassign arr.a $const u", "assign $tmp $const",
                   "aassign arr.rgb $const $tmp", "aassign arr.a $const $const",
                   "aref o arr.a $const", "end"}));
    // Into a nested struct field: the innermost ops write the fields themselves.
    EXPECT_EQ(
        mainOps(std::string(decls) +
                "shader t (output float o = 0) { Nest n = { { {u, 2, 3}, v }, 1 }; o = n.c.a; }"),
        (Ops{"color n.c.rgb u $const $const", "assign n.c.a v", "assign n.k $const",
             "assign o n.c.a", "end"}));
    // A struct returned as an init list lands in the caller's variable.
    EXPECT_EQ(mainOps(std::string(decls) +
                      "C4 make() { return { {1, 2, 3}, 4 }; }\n"
                      "shader t (output float o = 0) { C4 c = make(); o = c.a; }"),
              (Ops{"functioncall $const", "assign c.rgb $const", "assign c.a $const",
                   "assign o c.a", "end"}));
}

TEST(CodegenForms, TripleCastsAndOtherTriplesPassStraightIntoFunctions) {
    // The cast picks the vector overload; the point itself is passed, and the op named by the
    // overload treats it as a vector.
    const char* fn = "vector twice(vector d) { return transform(\"world\", d) * 2; }\n";
    Ops ops = mainOps(std::string(fn) + "shader t (output vector o = 0) { o = twice(P); }");
    ASSERT_GE(ops.size(), 3u);
    EXPECT_EQ(ops[2], "transformv $tmp $const $const P") << ops[2];
    EXPECT_EQ(mainOps("shader t (output vector o = 0) { o = transform(\"world\", (vector) P); }"),
              (Ops{"functioncall $const", "transformv o $const $const P", "end"}));
    EXPECT_EQ(mainOps("shader t (output normal o = 0) { o = transform(\"world\", (normal) P); }"),
              (Ops{"functioncall $const", "transformn o $const $const P", "end"}));
}

TEST(CodegenForms, CastArgumentStillSteersTheOverloadItWraps) {
    // The colour noise, not the float one widened.
    Ops ops = mainOps("float first(color c) { return c[0]; }\n"
                      "shader t (output float o = 0) { o = first((color) noise(P)); }");
    ASSERT_GE(ops.size(), 2u);
    EXPECT_EQ(ops[0], "noise $tmp P");
    EXPECT_EQ(ops[1], "functioncall $const");
}

TEST(CodegenForms, WeightedClosureNamesTheClosureFirst) {
    EXPECT_EQ(mainOps("shader t (output closure color c = 0) { c = u * emission(); }"),
              (Ops{"closure $tmp $const", "mul c $tmp u", "end"}));
    EXPECT_EQ(mainOps("shader t (output closure color c = 0) { c = emission() * color(1, 0, 0); }"),
              (Ops{"closure $tmp $const", "mul c $tmp $const", "end"}));
}

TEST(CodegenForms, ConstantArrayInitListArgumentIsOneConstant) {
    Ops ops = mainOps("float first(float a[]) { return a[0]; }\n"
                      "shader t (output float o = 0) { o = first({1.0, 2.0, 3.0}); }");
    ASSERT_FALSE(ops.empty());
    EXPECT_EQ(ops[0], "assign $tmp $const");
}

} // namespace
