// Behaviour of the shading system: loading, parameters, layers and lazy connections,
// derivatives, control flow, formatting, closures, symbols, attributes and the pickle.
#include "runtime_test_support.h"

#include <OSL/oslexec.h>

#include <gtest/gtest.h>

#include <cmath>

using namespace OSL;
using namespace runtime_test;

namespace {

class ShadingSystemTest : public ShadingFixture {
protected:
    ShadingSystemTest()
        : ShadingFixture({{"add", kAddOso},
                          {"upstream", kUpstreamOso},
                          {"downstream", kDownstreamOso},
                          {"derivs", kDerivsOso},
                          {"loop", kLoopOso},
                          {"printer", kPrintOso}}) {}
};

TEST_F(ShadingSystemTest, RunsWithDefaultParameterValues) {
    ShaderGroupRef g = single("add");
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 3.0f);
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
}

TEST_F(ShadingSystemTest, InstanceValuesReplaceDefaultsAndWrongTypesAreSkipped) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    const float a = 5.0f;
    const int b = 4;
    ss.Parameter(*g, "a", TypeFloat, &a);
    ss.Parameter(*g, "b", TypeInt, &b);
    ASSERT_TRUE(ss.Shader(*g, "surface", "add", "l"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    // An int is not converted for a float parameter: b keeps its default of 2.
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 7.0f);
    EXPECT_EQ(
        handler.warnings,
        "attempting to set parameter with wrong type: b (expected 'float', received 'int')\n");
}

TEST_F(ShadingSystemTest, UnknownShaderIsReportedAndFails) {
    ShaderGroupRef g = ss.ShaderGroupBegin("mygroup");
    EXPECT_FALSE(ss.Shader(*g, "surface", "no_such_shader", "l"));
    EXPECT_NE(handler.errors.find("Could not find shader \"no_such_shader\""), std::string::npos);
    EXPECT_NE(handler.errors.find("group: mygroup"), std::string::npos);
}

TEST_F(ShadingSystemTest, MalformedOsoIsRejectedWithoutReplacingTheLoadedShader) {
    EXPECT_FALSE(ss.LoadMemoryCompiledShader("add", "this is not OSO"));
    EXPECT_FALSE(handler.errors.empty());
    ShaderGroupRef g = single("add");
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 3.0f);
}

TEST_F(ShadingSystemTest, UpstreamLayerRunsLazilyAndOnlyOncePerExecute) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "downstream", "down"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "up", "out", "down", "x"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "up", "col", "down", "c"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    // x is read: upstream runs once although two of its outputs are connected.
    EXPECT_FLOAT_EQ(run<float>(*g, "result", 0.25f), 0.25f * 2 + 1);
    EXPECT_EQ(handler.messages, "upstream ran\nc = 0.25 0.5 2\n");
    handler.messages.clear();
    EXPECT_FLOAT_EQ(run<float>(*g, "result", 0.75f), 0.75f * 2 + 1);
    EXPECT_EQ(handler.messages, "upstream ran\nc = 0.75 0.5 2\n");
}

TEST_F(ShadingSystemTest, UpstreamLayerWhoseOutputsAreNeverReadDoesNotRun) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    const int one = 1;
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
    ss.Parameter(*g, "usecolor", TypeInt, &one);
    ASSERT_TRUE(ss.Shader(*g, "surface", "downstream", "down"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "up", "out", "down", "x"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    // usecolor jumps over the only read of x; c is not connected.
    EXPECT_FLOAT_EQ(run<float>(*g, "result"), 0.0f);
    EXPECT_EQ(handler.messages, "c = 5 5 5\n");
}

TEST_F(ShadingSystemTest, ConnectionsFeedComponentsFromSingleValues) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "downstream", "down"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "up", "out", "down", "c[1]"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "up", "col[2]", "down", "x"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    EXPECT_FLOAT_EQ(run<float>(*g, "result", 0.5f), 2.0f + 1.0f);
    EXPECT_EQ(handler.messages, "upstream ran\nc = 5 1 5\n");
}

TEST_F(ShadingSystemTest, BadConnectionsAreReportedAndRejected) {
    ShaderGroupRef g = ss.ShaderGroupBegin("g1");
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "downstream", "down"));
    EXPECT_FALSE(ss.ConnectShaders(*g, "nowhere", "out", "down", "x"));
    EXPECT_NE(handler.errors.find("ConnectShaders: source layer \"nowhere\" not found"),
              std::string::npos);
    EXPECT_FALSE(ss.ConnectShaders(*g, "up", "col", "down", "usecolor"));
    EXPECT_NE(handler.errors.find("cannot connect a color"), std::string::npos);
    EXPECT_FALSE(ss.ConnectShaders(*g, "up", "missing", "down", "x"));
    EXPECT_FALSE(ss.ConnectShaders(*g, "down", "result", "up", "k"));
    EXPECT_TRUE(ss.ShaderGroupEnd(*g));
    // The group still runs with the defaults of unconnected inputs.
    EXPECT_FLOAT_EQ(run<float>(*g, "result"), 11.0f);
}

TEST_F(ShadingSystemTest, DerivativesFollowTheChainRule) {
    ShaderGroupRef g = single("derivs");
    // d/dx (u*u) = 2 u du/dx = 2 * 0.5 * 0.1
    EXPECT_NEAR(run<float>(*g, "d", 0.5f), 0.1f, 1e-6f);
    EXPECT_NEAR(run<float>(*g, "w", 0.5f), 0.1f, 1e-6f);
    EXPECT_NEAR(run<float>(*g, "a", 0.5f), 0.01f, 1e-6f);
}

TEST_F(ShadingSystemTest, ForLoopWithBreak) {
    ShaderGroupRef g = single("loop");
    EXPECT_EQ(run<int>(*g, "sum"), 45);
    ShaderGroupRef g2 = ss.ShaderGroupBegin("");
    const int stop = 4;
    ss.Parameter(*g2, "stop", TypeInt, &stop);
    ASSERT_TRUE(ss.Shader(*g2, "surface", "loop", "l"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g2));
    EXPECT_EQ(run<int>(*g2, "sum"), 0 + 1 + 2 + 3);
}

TEST_F(ShadingSystemTest, PrintfFollowsOslFormatRules) {
    ShaderGroupRef g = single("printer");
    ShaderGlobals sg = globalsAt(0, 0);
    ASSERT_TRUE(ss.execute(*ctx, *g, 0, sg));
    EXPECT_EQ(handler.messages, "f=0.5 i=42 c=0.25 0.5 1 s=hello pct=%\narr=1.0 2.0 3.0 i=42.00\n");
    const ShaderSymbol* sym = ss.find_symbol(*g, ustring("formatted"));
    ASSERT_NE(sym, nullptr);
    EXPECT_EQ(ss.symbol_typedesc(sym), TypeString);
    EXPECT_EQ(*static_cast<const ustring*>(ss.symbol_address(*ctx, sym)), ustring("[42]"));
}

TEST_F(ShadingSystemTest, ClosuresBuildWeightedTrees) {
    struct NParams {
        Vec3 N;
        ustring label;
    };
    const ClosureParam none[] = {{TypeDesc(), 1, nullptr, 1}};
    const ClosureParam diffuse[] = {CLOSURE_VECTOR_PARAM(NParams, N),
                                    CLOSURE_STRING_KEYPARAM(NParams, label, "label"),
                                    CLOSURE_FINISH_PARAM(NParams)};
    ss.register_closure("emission", 1, none, nullptr, nullptr);
    ss.register_closure("diffuse", 3, diffuse, nullptr, nullptr);
    ASSERT_TRUE(ss.LoadMemoryCompiledShader("glow", kClosureOso));
    ShaderGroupRef g = single("glow");
    ShaderGlobals sg = globalsAt(0, 0);
    ASSERT_TRUE(ss.execute(*ctx, *g, 0, sg));
    ASSERT_NE(sg.Ci, nullptr);
    ASSERT_EQ(sg.Ci->id, ClosureColor::MUL);
    EXPECT_EQ(sg.Ci->as_mul()->weight, Color3(0.5f));
    ASSERT_EQ(sg.Ci->as_mul()->closure->id, 1);

    ShaderGroupRef g2 = ss.ShaderGroupBegin("");
    const int flag = 1;
    ss.Parameter(*g2, "flag", TypeInt, &flag);
    ASSERT_TRUE(ss.Shader(*g2, "surface", "glow", "l"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g2));
    sg = globalsAt(0, 0);
    ASSERT_TRUE(ss.execute(*ctx, *g2, 0, sg));
    ASSERT_NE(sg.Ci, nullptr);
    ASSERT_EQ(sg.Ci->id, ClosureColor::ADD);
    const ClosureComponent* d = sg.Ci->as_add()->closureB->as_comp();
    ASSERT_EQ(d->id, 3);
    EXPECT_EQ(d->as<NParams>()->N, Vec3(0, 0, 1));
    EXPECT_EQ(d->w, Vec3(1.0f));
    // The weight sits right after the id, where renderers read it.
    EXPECT_EQ(reinterpret_cast<const char*>(&d->w) - reinterpret_cast<const char*>(d), 4);
}

TEST_F(ShadingSystemTest, UnregisteredClosureMakesTheGroupFail) {
    ASSERT_TRUE(ss.LoadMemoryCompiledShader("glow", kClosureOso));
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ASSERT_TRUE(ss.Shader(*g, "surface", "glow", "l"));
    EXPECT_FALSE(ss.ShaderGroupEnd(*g));
    EXPECT_NE(handler.errors.find("Closure 'emission' is not supported"), std::string::npos);
    ShaderGlobals sg = globalsAt(0, 0);
    EXPECT_FALSE(ss.execute(*ctx, *g, 0, sg));
}

TEST_F(ShadingSystemTest, SymbolsAreFoundByLayerAndHaveNoAddressInAnUnrelatedContext) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ASSERT_TRUE(ss.Shader(*g, "surface", "add", "first"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "add", "second"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    const ShaderSymbol* a = ss.find_symbol(*g, ustring("first"), ustring("out"));
    const ShaderSymbol* b = ss.find_symbol(*g, ustring("out"));
    ASSERT_NE(a, nullptr);
    ASSERT_NE(b, nullptr);
    EXPECT_NE(a, b); // the unqualified name finds the last layer
    EXPECT_EQ(ss.find_symbol(*g, ustring("second.out")), b);
    EXPECT_EQ(ss.find_symbol(*g, ustring("nope")), nullptr);
    EXPECT_EQ(ss.symbol_typedesc(a), TypeFloat);
    ShadingContext* other = ss.get_context(thread);
    EXPECT_EQ(ss.symbol_address(*other, a), nullptr);
    ss.release_context(other);
}

TEST_F(ShadingSystemTest, GroupAttributesDescribeTheGroup) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "downstream", "down"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "up", "out", "down", "x"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    int n = 0;
    ASSERT_TRUE(ss.getattribute(g.get(), "num_layers", TypeInt, &n));
    EXPECT_EQ(n, 2);
    ASSERT_TRUE(ss.getattribute(g.get(), "num_globals_needed", TypeInt, &n));
    EXPECT_EQ(n, 2);
    ustring globals[2];
    ASSERT_TRUE(ss.getattribute(g.get(), "globals_needed", TypeDesc(TypeDesc::STRING, 2), globals));
    EXPECT_EQ(globals[0], ustring("u"));
    EXPECT_EQ(globals[1], ustring("v"));
    EXPECT_FALSE(ss.getattribute(g.get(), "no_such_attribute", TypeInt, &n));
}

TEST_F(ShadingSystemTest, RendererOutputsMakeALayerRunEagerly) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "add", "last"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    ShaderGlobals sg = globalsAt(0.5f, 0.5f);
    ASSERT_TRUE(ss.execute(*ctx, *g, 0, sg));
    EXPECT_EQ(handler.messages, ""); // not connected, not an output: never runs
    ustring outs[] = {ustring("out"), ustring("up.col")};
    ASSERT_TRUE(ss.attribute(g.get(), "renderer_outputs", TypeDesc(TypeDesc::STRING, 2), outs));
    ASSERT_TRUE(ss.execute(*ctx, *g, 0, sg));
    EXPECT_EQ(handler.messages, "upstream ran\n");
}

TEST_F(ShadingSystemTest, PickleRebuildsAnEquivalentGroup) {
    ShaderGroupRef g = ss.ShaderGroupBegin("");
    const float k = 3.0f;
    ss.Parameter(*g, "k", TypeFloat, &k);
    ASSERT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
    ASSERT_TRUE(ss.Shader(*g, "surface", "downstream", "down"));
    ASSERT_TRUE(ss.ConnectShaders(*g, "up", "out", "down", "x"));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    ustring pickle;
    ASSERT_TRUE(ss.getattribute(g.get(), "pickle", TypeString, &pickle));
    ShaderGroupRef again = ss.ShaderGroupBegin("", "surface", pickle.string());
    ASSERT_TRUE(ss.ShaderGroupEnd(*again));
    EXPECT_TRUE(handler.errors.empty()) << handler.errors;
    EXPECT_FLOAT_EQ(run<float>(*g, "result", 0.5f), run<float>(*again, "result", 0.5f));
    EXPECT_FLOAT_EQ(run<float>(*again, "result", 0.5f), 0.5f * 3 + 1);
    ustring pickle2;
    ASSERT_TRUE(ss.getattribute(again.get(), "pickle", TypeString, &pickle2));
    EXPECT_EQ(pickle, pickle2);
}

TEST_F(ShadingSystemTest, SystemAttributesRoundTripAndRejectUnknownNames) {
    EXPECT_TRUE(ss.attribute("optimize", 0));
    int v = -1;
    EXPECT_TRUE(ss.getattribute("optimize", TypeInt, &v));
    EXPECT_EQ(v, 0);
    EXPECT_FALSE(ss.attribute("definitely_not_an_attribute", 1));
    EXPECT_EQ(ss.raytype_bit(ustring("camera")), 1);
    EXPECT_EQ(ss.raytype_bit(ustring("shadow")), 2);
    EXPECT_EQ(ss.raytype_bit(ustring("unknown")), 0);
    EXPECT_NE(ss.texturesys(), nullptr);
}

} // namespace
