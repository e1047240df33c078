// The standard library functions written in OSL (stdosl.h): a call is inlined after a
// `functioncall` op and built from ops every runtime provides, the ops oslc's library produces;
// the functions the runtime provides natively stay single ops.
#include "compiler_test_support.h"

#include <OSL/oslcomp.h>

#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <vector>

namespace {

struct Op {
    std::string name;
    std::vector<std::string> args;
};

// The instructions of the main code section, without hints and comments.
std::vector<Op> opsOf(const std::string& oso) {
    std::vector<Op> ops;
    std::istringstream in(oso);
    std::string line;
    bool code = false;
    while (std::getline(in, line)) {
        if (line.rfind("code ", 0) == 0) code = true;
        if (!code || line.empty() || line[0] != '\t') continue;
        std::istringstream words(line.substr(0, line.find('%')));
        Op op;
        words >> op.name;
        for (std::string w; words >> w;) op.args.push_back(w);
        ops.push_back(op);
    }
    return ops;
}

std::vector<std::string> names(const std::vector<Op>& ops) {
    std::vector<std::string> n;
    for (const auto& op : ops) n.push_back(op.name);
    return n;
}

int count(const std::vector<Op>& ops, const std::string& name) {
    int n = 0;
    for (const auto& op : ops) n += op.name == name;
    return n;
}

struct Compiled {
    bool ok = false;
    std::string oso;
    std::vector<Op> ops;
    compiler_test::CollectingHandler eh;
    std::string firstError() const { return eh.firstError(); }
};

std::unique_ptr<Compiled> compile(const std::string& body, const std::string& params = "",
                                  const std::string& prelude = "") {
    auto c = std::make_unique<Compiled>();
    OSL::OSLCompiler comp(&c->eh);
    c->ok = comp.compile_buffer(prelude + "shader t (" + params + ") {\n" + body + "\n}\n", c->oso,
                                {}, "", "t.osl");
    c->ops = opsOf(c->oso);
    return c;
}

// The ops of the function body that starts after the first `functioncall`, up to where the call
// says it ends.
std::vector<std::string> bodyOfFirstCall(const std::vector<Op>& ops) {
    for (size_t i = 0; i < ops.size(); ++i) {
        if (ops[i].name != "functioncall") continue;
        size_t end = std::stoul(ops[i].args.at(1));
        std::vector<std::string> body;
        for (size_t j = i + 1; j < end && j < ops.size(); ++j) body.push_back(ops[j].name);
        return body;
    }
    return {};
}

using Names = std::vector<std::string>;

TEST(StandardLibrary, GeometryFunctionsAreInlinedOsl) {
    for (const char* call :
         {"vector r = reflect(I, N);", "vector r = refract(I, N, 1.5);",
          "vector r = faceforward(N, I);", "normal r = faceforward(N, I, Ng);",
          "float kr, kt; vector R, T; fresnel(I, N, 1.3, kr, kt, R, T);",
          "float kr, kt; fresnel(I, N, 1.3, kr, kt);", "point r = rotate(P, 1.0, point(0,0,1));",
          "float d = distance(P, point(1), point(2));"}) {
        auto c = compile(call);
        ASSERT_TRUE(c->ok) << call << ": " << c->firstError();
        EXPECT_GE(count(c->ops, "functioncall"), 1) << call;
        for (const char* gone : {"reflect", "refract", "faceforward", "fresnel", "rotate"})
            EXPECT_EQ(count(c->ops, gone), 0) << call << " still emits " << gone;
    }
}

TEST(StandardLibrary, ReflectIsTheMirrorFormula) {
    auto c = compile("vector r = reflect(I, N);");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(bodyOfFirstCall(c->ops), (Names{"dot", "mul", "mul", "sub"}));
    // The result is computed straight into the variable, as oslc does.
    auto sub =
        std::find_if(c->ops.begin(), c->ops.end(), [](const Op& o) { return o.name == "sub"; });
    ASSERT_NE(sub, c->ops.end());
    EXPECT_EQ(sub->args.at(0), "r") << "no copy through a temporary";
}

TEST(StandardLibrary, ConditionalReturnsKeepTheirReturnOp) {
    auto c = compile("vector r = refract(I, N, 1.5);");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(bodyOfFirstCall(c->ops),
              (Names{"dot", "mul", "mul", "sub", "mul", "sub", "lt", "if", "assign", "mul", "mul",
                     "sqrt", "add", "mul", "sub", "return"}));
    EXPECT_EQ(count(c->ops, "vector"), 0) << "the zero vector is a constant";
}

TEST(StandardLibrary, NestedCallsReturnIntoTheCallersResult) {
    // The two-argument forms call the full ones, whose result is the caller's.
    auto c = compile("float a = aastep(0.5, u);", "", "");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(names(c->ops),
              (Names{"functioncall", "filterwidth", "filterwidth", "functioncall", "fabs",
                     "fabs",         "add",         "mul",         "sub",          "le",
                     "if",           "assign",      "add",         "ge",           "if",
                     "assign",       "sub",         "div",         "return",       "end"}));
    auto f = compile("vector r = faceforward(N, I);");
    ASSERT_TRUE(f->ok) << f->firstError();
    EXPECT_EQ(names(f->ops), (Names{"functioncall", "functioncall", "dot", "gt", "if", "neg",
                                    "assign", "return", "end"}));
}

TEST(StandardLibrary, FresnelComputesDirectionsAndWeights) {
    auto c = compile("float kr, kt; vector R, T; fresnel(I, N, 1.3, kr, kt, R, T);");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(count(c->ops, "functioncall"), 6) << "fresnel, reflect, refract and three sqr";
    EXPECT_EQ(count(c->ops, "sqrt"), 2);
    // Kr, refract's zero vector on total internal reflection, then Kr, Kt and T when fresnel
    // itself finds it.
    EXPECT_EQ(count(c->ops, "assign"), 5);
}

TEST(StandardLibrary, ScalarHelpersAreInlinedOsl) {
    struct Case {
        const char* call;
        Names body;
    };
    for (const Case& k : std::vector<Case>{
             {"float r = degrees(u);", {"div", "mul"}},
             {"float r = radians(u);", {"div", "mul"}},
             {"color r = degrees(color(u));", {"div", "mul"}},
             {"float r = hypot(u, v);", {"mul", "mul", "add", "sqrt"}},
             {"float r = hypot(u, v, 2.0);", {"mul", "mul", "add", "mul", "add", "sqrt"}},
             {"float r = log(u, 3.0);", {"log", "log", "div"}},
             {"float r = mod(u, 0.3);", {"div", "floor", "mul", "sub"}},
             {"color r = mod(color(u), 0.3);", {"div", "floor", "mul", "sub"}},
             {"float r = clamp(u, 0.2, 0.8);", {"min", "max"}},
             {"int r = clamp(3, 0, 2);", {"min", "max"}},
             {"point r = transform(\"world\", P);", {"transform"}},
             {"vector r = transform(\"world\", I);", {"transformv"}},
             {"normal r = transform(\"world\", N);", {"transformn"}},
             {"color r = transformc(\"hsv\", color(u));", {"transformc"}},
         }) {
        auto c = compile(k.call);
        ASSERT_TRUE(c->ok) << k.call << ": " << c->firstError();
        EXPECT_EQ(bodyOfFirstCall(c->ops), k.body) << k.call;
    }
}

TEST(StandardLibrary, StepsAreInlinedPerComponent) {
    auto f = compile("float r = linearstep(0.25, 0.75, u);");
    ASSERT_TRUE(f->ok) << f->firstError();
    EXPECT_EQ(count(f->ops, "linearstep"), 0);
    EXPECT_EQ(count(f->ops, "step"), 1) << "coincident edges fall back to step";
    auto s = compile("float r = smooth_linearstep(0.25, 0.75, u, 0.05);");
    ASSERT_TRUE(s->ok) << s->firstError();
    EXPECT_EQ(count(s->ops, "smooth_linearstep"), 0);
    EXPECT_EQ(count(s->ops, "functioncall"), 3) << "itself and the two rounded corners";
    auto c = compile("color r = smoothstep(color(0.2), color(0.8), color(u));");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(count(c->ops, "smoothstep"), 3) << "the float op, once per channel";
    EXPECT_EQ(count(c->ops, "compref"), 9);
    auto p = compile("point r = smoothstep(point(0.2), point(0.8), P);");
    ASSERT_TRUE(p->ok) << p->firstError();
    EXPECT_EQ(count(p->ops, "vector"), 1) << "built as a vector straight into the point";
    EXPECT_EQ(count(p->ops, "assign"), 0) << "constant arguments are constants";
}

TEST(StandardLibrary, NativeOpsStaySingleOps) {
    for (const char* call : {"float r = smoothstep(0.2, 0.8, u);",
                             "color r = mix(color(0), color(1), u);", "float r = step(0.5, u);",
                             "float r = distance(P, point(1));", "float r = select(u, v, 1);",
                             "float r = fmod(u, 0.5);", "int r = 7 % 3;", "int r = mod(7, 3);"}) {
        auto c = compile(call);
        ASSERT_TRUE(c->ok) << call << ": " << c->firstError();
        EXPECT_EQ(count(c->ops, "functioncall"), 0) << call;
    }
}

TEST(StandardLibrary, ShortClosureFormsFillInTheirDefaults) {
    auto c = compile("Ci = reflection(N) + microfacet(\"ggx\", N, 0.2, 1.5, 0);");
    ASSERT_TRUE(c->ok) << c->firstError();
    ASSERT_EQ(count(c->ops, "closure"), 2);
    for (const auto& op : c->ops) {
        if (op.name != "closure") continue;
        // result, closure name, then the full argument list
        if (op.args.size() == 4) continue; // reflection: N and eta
        EXPECT_EQ(op.args.size(), 9u) << "microfacet with U, both roughnesses, eta and refr";
    }
}

TEST(StandardLibrary, UserFunctionsReplaceLibraryOnes) {
    auto c =
        compile("float r = hypot(u, v);", "", "float hypot(float a, float b) { return a + b; }\n");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_EQ(bodyOfFirstCall(c->ops), (Names{"add"}));
}

TEST(StandardLibrary, DestinationIsNotAnArgument) {
    // x is the argument: the function's result must not be written into it before the body is
    // done reading it.
    auto c = compile("float x = u; x = twice(x); printf(\"%g\", x);", "",
                     "float twice(float a) { float t = a; if (t > 1) return t; return a * 2; }\n");
    ASSERT_TRUE(c->ok) << c->firstError();
    int call = -1, end = -1;
    for (size_t i = 0; i < c->ops.size(); ++i)
        if (c->ops[i].name == "functioncall") call = int(i), end = std::stoi(c->ops[i].args.at(1));
    ASSERT_GE(call, 0);
    for (int i = call + 1; i < end; ++i) {
        if (c->ops[i].args.empty() || c->ops[i].name == "if") continue;
        EXPECT_NE(c->ops[i].args[0], "x") << "op " << i << " " << c->ops[i].name;
    }
    EXPECT_EQ(c->ops.at(end).name, "assign");
    EXPECT_EQ(c->ops.at(end).args.at(0), "x");
}

} // namespace

namespace {

TEST(StandardLibrary, LiteralArraysAreConstants) {
    auto c = compile("string s[3] = {\"a\", \"b\", \"c\"}; float f[2] = {1, -2.5};"
                     " float g[2] = {u, 1}; printf(\"%s %g %g\", s[1], f[1], g[0]);");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_NE(c->oso.find("const\tstring[3]\t"), std::string::npos) << c->oso;
    EXPECT_NE(c->oso.find("\t1 -2.5\t"), std::string::npos) << c->oso;
    EXPECT_EQ(count(c->ops, "aassign"), 2) << "only the array with a varying element";
    EXPECT_EQ(count(c->ops, "assign"), 2);
}

TEST(StandardLibrary, DerivativeOfAPositionIsADirection) {
    auto c = compile("vector d = Dx(P); point q = P + Dy(P);");
    ASSERT_TRUE(c->ok) << c->firstError();
    EXPECT_NE(c->oso.find("\tDx\t\td P"), std::string::npos) << c->oso;
}

} // namespace
