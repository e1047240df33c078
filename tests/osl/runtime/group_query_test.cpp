// Questions asked of a built group: OSLQuery of a layer, the globals it needs, symbols by name,
// parameters changed between executions, layers run one by one with their trace, and group
// descriptions that do not parse.
#include "runtime_test_support.h"

#include <OSL/oslexec.h>
#include <OSL/oslquery.h>

#include <gtest/gtest.h>

using namespace OSL;
using namespace runtime_test;

namespace {

// bf = backfacing()
const char* kFacingOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader facing
oparam	int	bf	0		%read{2147483647,-1} %write{0,0}
global	float	v	%read{2147483647,-1} %write{2147483647,-1}
code ___main___
	backfacing	bf 	%argrw{"w"}
	end
)";

// out = u * k, with k taken from the geometry.
const char* kGeomOso = R"(OpenShadingLanguage 1.00
# Compiled by oslc 1.12.13.0
shader geom
param	float	k	2		%meta{int,lockgeom,0} %read{0,0} %write{2147483647,-1}
param	float	fixed	3		%read{2147483647,-1} %write{2147483647,-1}
oparam	float	out	0		%read{2147483647,-1} %write{0,0}
global	float	u	%read{0,0} %write{2147483647,-1}
code ___main___
	mul		out u k 	%argrw{"wrr"}
	end
)";

class GroupQuery : public ShadingFixture {
protected:
    GroupQuery()
        : ShadingFixture({{"add", kAddOso},
                          {"upstream", kUpstreamOso},
                          {"downstream", kDownstreamOso},
                          {"facing", kFacingOso},
                          {"geom", kGeomOso}}) {}

    // upstream "up" feeding downstream "down".x
    ShaderGroupRef chain() {
        ShaderGroupRef g = ss.ShaderGroupBegin("chain");
        EXPECT_TRUE(ss.Shader(*g, "surface", "upstream", "up"));
        EXPECT_TRUE(ss.Shader(*g, "surface", "downstream", "down"));
        EXPECT_TRUE(ss.ConnectShaders(*g, "up", "out", "down", "x"));
        return g;
    }
};

TEST_F(GroupQuery, OslQueryDescribesALayerWithItsInstanceValues) {
    const float b = 7.0f;
    ShaderGroupRef g = single("add", {{"b", TypeFloat, &b}});
    OSLQuery q(g.get(), 0);
    EXPECT_EQ(q.shadername(), "add");
    ASSERT_EQ(q.nparams(), 3u);
    EXPECT_EQ(q.getparam(0)->name, "a");
    EXPECT_FALSE(q.getparam(0)->isoutput);
    ASSERT_EQ(q.getparam(0)->fdefault.size(), 1u);
    EXPECT_FLOAT_EQ(q.getparam(0)->fdefault[0], 1.0f);
    ASSERT_EQ(q.getparam(1)->fdefault.size(), 1u);
    EXPECT_FLOAT_EQ(q.getparam(1)->fdefault[0], 7.0f);
    EXPECT_TRUE(q.getparam(2)->isoutput);
    EXPECT_EQ(q.getparam(2)->type, TypeFloat);

    OSLQuery none;
    EXPECT_FALSE(none.init(g.get(), 1));
    EXPECT_FALSE(none.geterror().empty());
    EXPECT_FALSE(none.init(nullptr, 0));
}

TEST_F(GroupQuery, GlobalsNeededAreSortedAndIncludeWhatBackfacingReads) {
    ShaderGroupRef g = single("facing");
    int n = 0;
    ASSERT_TRUE(ss.getattribute(g.get(), "num_globals_needed", TypeInt, &n));
    ASSERT_EQ(n, 2); // v is declared but never used
    const ustring* names = nullptr;
    ASSERT_TRUE(ss.getattribute(g.get(), "globals_needed", TypeDesc::PTR, &names));
    ASSERT_NE(names, nullptr);
    EXPECT_EQ(names[0], "I");
    EXPECT_EQ(names[1], "N");
    ustring copy[2];
    ASSERT_TRUE(ss.getattribute(g.get(), "globals_needed", TypeDesc(TypeDesc::STRING, 2), copy));
    EXPECT_EQ(copy[1], "N");
}

TEST_F(GroupQuery, GetSymbolReadsTheContextsLatestValues) {
    ShaderGroupRef g = chain();
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    ShaderGlobals sg = globalsAt(0.25f, 0.5f);
    TypeDesc t;
    EXPECT_EQ(ss.get_symbol(*ctx, ustring("down"), ustring("result"), t), nullptr);
    ASSERT_TRUE(ss.execute(*ctx, *g, 0, sg));
    const void* p = ss.get_symbol(*ctx, ustring("down"), ustring("result"), t);
    ASSERT_NE(p, nullptr);
    EXPECT_EQ(t, TypeFloat);
    EXPECT_FLOAT_EQ(*static_cast<const float*>(p), 0.25f * 2.0f + 1.0f);
    EXPECT_EQ(ss.get_symbol(*ctx, ustring("down"), ustring("nosuch"), t), nullptr);
    EXPECT_EQ(t, TypeDesc());
    EXPECT_EQ(ss.find_layer(*g, ustring("down")), 1);
    EXPECT_EQ(ss.find_layer(*g, ustring("nosuch")), -1);
}

TEST_F(GroupQuery, ReParameterChangesOnlyGeometricParameters) {
    ShaderGroupRef g = single("geom");
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 1.0f);
    const float k = 10.0f;
    ASSERT_TRUE(ss.ReParameter(*g, "layer", "k", TypeFloat, &k));
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 5.0f);
    // A constant parameter, a wrong type or an unknown name leave the group as it was.
    EXPECT_FALSE(ss.ReParameter(*g, "layer", "fixed", TypeFloat, &k));
    const int ik = 3;
    EXPECT_FALSE(ss.ReParameter(*g, "layer", "k", TypeInt, &ik));
    EXPECT_FALSE(ss.ReParameter(*g, "layer", "nosuch", TypeFloat, &k));
    EXPECT_FALSE(ss.ReParameter(*g, "nolayer", "k", TypeFloat, &k));
    EXPECT_FLOAT_EQ(run<float>(*g, "out"), 5.0f);
}

TEST_F(GroupQuery, LayersRunOneByOneWithTheirTrace) {
    ss.attribute("llvm_debug_layers", 1);
    ShaderGroupRef g = chain();
    ustring entries[] = {ustring("up"), ustring("down")};
    ASSERT_TRUE(ss.attribute(g.get(), "entry_layers", TypeDesc(TypeDesc::STRING, 2), entries));
    ASSERT_TRUE(ss.ShaderGroupEnd(*g));
    ShaderGlobals sg = globalsAt(0.5f, 0.5f);
    ASSERT_TRUE(ss.execute_init(*ctx, *g, 0, sg, nullptr, nullptr));
    ASSERT_TRUE(ss.execute_layer(*ctx, 0, sg, nullptr, nullptr, 1));
    ASSERT_TRUE(ss.execute_layer(*ctx, 0, sg, nullptr, nullptr, 0));
    EXPECT_FALSE(ss.execute_layer(*ctx, 0, sg, nullptr, nullptr, 2));
    ASSERT_TRUE(ss.execute_cleanup(*ctx));
    EXPECT_EQ(handler.messages, "(node down) checking for already-run layer 1 down downstream\n"
                                "(node down) enter layer 1 down downstream\n"
                                "(node up) checking for already-run layer 0 up upstream\n"
                                "(node up) enter layer 0 up upstream\n"
                                "upstream ran\n"
                                "(node up) exit layer 0 up upstream\n"
                                "c = 5 5 5\n"
                                "(node down) exit layer 1 down downstream\n"
                                "(node up) checking for already-run layer 0 up upstream\n"
                                "(node up)   taking early exit, already executed layer 0 up "
                                "upstream\n");
}

TEST_F(GroupQuery, AGroupDescriptionThatFailsNamesTheStatement) {
    ShaderGroupRef g =
        ss.ShaderGroupBegin("bad", "surface", "shader add a;\nconnect x.out a.b;\nshader add c;");
    EXPECT_EQ(g, nullptr);
    EXPECT_NE(handler.errors.find("ShaderGroupBegin: error parsing group description: \n"
                                  "        group: bad\n"
                                  "        problem might be here: connect x.out a.b;\n"
                                  "shader add c;"),
              std::string::npos)
        << handler.errors;
    ShaderGroupRef ok = ss.ShaderGroupBegin("good", "surface", "param float b 5 ; shader add a ;");
    ASSERT_NE(ok, nullptr);
    ASSERT_TRUE(ss.ShaderGroupEnd(*ok));
    EXPECT_FLOAT_EQ(run<float>(*ok, "out"), 6.0f);
}

} // namespace
