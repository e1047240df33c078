// CopyShaderParams over every host type, tables, controllers and maps; InitArrayDefaults from the
// array defaults of a compiled shader.
#include "map/shader_update.h"
#include "map_test_host.h"

#include <trelm/params/keyframe_control.h>

#include <memory>

using namespace TrelmSDK;

namespace {

class PlainOwner : public ReferenceTarget {};

ParamDef Def(ParamID id, const wchar_t* name, int type, int flags = P_ANIMATABLE) {
    ParamDef d;
    d.ID = id;
    d.int_name = name;
    d.type = type;
    d.flags = flags;
    d.def = ZeroValue(type);
    if (IsTabType(type)) d.tab_size = 1;
    return d;
}

// A block layout holding one parameter of every host type the copy knows, plus tables and a
// boolean (a type the copy has no rule for). IDs differ between the two layouts on purpose: the
// copy goes by name.
std::unique_ptr<ParamBlockDesc2> Layout(const wchar_t* internalName, ParamID base) {
    auto d = std::make_unique<ParamBlockDesc2>(BlockID(1), internalName, 0, nullptr, 0);
    const struct {
        const wchar_t* name;
        int type;
        int flags;
    } rows[] = {
        {L"f", TYPE_FLOAT, P_ANIMATABLE},
        {L"w", TYPE_WORLD, P_ANIMATABLE},
        {L"i", TYPE_INT, P_ANIMATABLE},
        {L"p3", TYPE_POINT3, P_ANIMATABLE},
        {L"s", TYPE_STRING, 0},
        {L"fn", TYPE_FILENAME, 0},
        {L"m", TYPE_TEXMAP, 0},
        {L"mx", TYPE_MATRIX3, 0},
        {L"p4", TYPE_POINT4, P_ANIMATABLE},
        {L"c", TYPE_FRGBA, P_ANIMATABLE},
        {L"p2", TYPE_POINT2, P_ANIMATABLE},
        {L"ft", TYPE_FLOAT_TAB, P_ANIMATABLE},
        {L"st", TYPE_STRING_TAB, 0},
        {L"b", TYPE_BOOL, P_ANIMATABLE},
        {L"typeChange", TYPE_FLOAT, P_ANIMATABLE},
        {L"tabChange", TYPE_FLOAT, P_ANIMATABLE},
    };
    ParamID id = base;
    for (const auto& r : rows) EXPECT_TRUE(d->AddParam(Def(id++, r.name, r.type, r.flags)));
    return d;
}

ParamID IDOf(IParamBlock2* pb, const wchar_t* name) {
    return pb->IndextoID(pb->GetDesc()->NameToIndex(name));
}

class CopyShaderParamsTest : public ::testing::Test {
protected:
    void SetUp() override {
        MapTestRoot();
        oldDesc = Layout(L"old", 0);
        newDesc = Layout(L"new", 100);
        // The same names with another type / table-ness in the new layout.
        newDesc->DeleteParam(IDOf2(*newDesc, L"typeChange"));
        newDesc->AddParam(Def(200, L"typeChange", TYPE_INT));
        newDesc->DeleteParam(IDOf2(*newDesc, L"tabChange"));
        newDesc->AddParam(Def(201, L"tabChange", TYPE_FLOAT_TAB));
        oldBlock = CreateParameterBlock2(oldDesc.get(), &owner);
        newBlock = CreateParameterBlock2(newDesc.get(), &owner);
        upstream = static_cast<OSLTex*>(GetOSLTexDesc()->Create(false));
    }
    void TearDown() override {
        theHold.ClearStacks();
        oldBlock->DeleteMe();
        newBlock->DeleteMe();
        upstream->DeleteMe();
    }
    static ParamID IDOf2(const ParamBlockDesc2& d, const wchar_t* name) {
        return d.IndextoID(d.NameToIndex(name));
    }
    void FillOld() {
        IParamBlock2* o = oldBlock;
        o->SetValue(IDOf(o, L"f"), 0, 1.5f);
        o->SetValue(IDOf(o, L"w"), 0, 2.5f);
        o->SetValue(IDOf(o, L"i"), 0, 7);
        o->SetValue(IDOf(o, L"p3"), 0, Point3(1, 2, 3));
        o->SetValue(IDOf(o, L"s"), 0, L"text");
        o->SetValue(IDOf(o, L"fn"), 0, L"/tmp/a.png");
        o->SetValue(IDOf(o, L"m"), 0, upstream);
        o->SetValue(IDOf(o, L"mx"), 0,
                    Matrix3(Point3(1, 2, 3), Point3(4, 5, 6), Point3(7, 8, 9), Point3(10, 11, 12)));
        o->SetValue(IDOf(o, L"p4"), 0, Point4(1, 2, 3, 4));
        o->SetValue(IDOf(o, L"c"), 0, AColor(0.1f, 0.2f, 0.3f, 0.4f));
        o->SetValue(IDOf(o, L"p2"), 0, Point2(5, 6));
        o->SetCount(IDOf(o, L"ft"), 3);
        for (int k = 0; k < 3; ++k) o->SetValue(IDOf(o, L"ft"), 0, 10.0f + k, k);
        o->SetCount(IDOf(o, L"st"), 2);
        o->SetValue(IDOf(o, L"st"), 0, L"one", 0);
        o->SetValue(IDOf(o, L"st"), 0, L"two", 1);
        o->SetValue(IDOf(o, L"b"), 0, true);
        o->SetValue(IDOf(o, L"typeChange"), 0, 3.0f);
        o->SetValue(IDOf(o, L"tabChange"), 0, 4.0f);
    }

    PlainOwner owner;
    std::unique_ptr<ParamBlockDesc2> oldDesc, newDesc;
    IParamBlock2* oldBlock = nullptr;
    IParamBlock2* newBlock = nullptr;
    OSLTex* upstream = nullptr;
};

} // namespace

TEST_F(CopyShaderParamsTest, CopiesEveryTypeRowByName) {
    FillOld();
    MessageProbe probe;
    EXPECT_TRUE(CopyShaderParams(oldBlock, newBlock, false));
    IParamBlock2* n = newBlock;
    EXPECT_FLOAT_EQ(n->GetFloat(IDOf(n, L"f")), 1.5f);
    EXPECT_FLOAT_EQ(n->GetFloat(IDOf(n, L"w")), 2.5f);
    EXPECT_EQ(n->GetInt(IDOf(n, L"i")), 7);
    EXPECT_EQ(n->GetPoint3(IDOf(n, L"p3")), Point3(1, 2, 3));
    EXPECT_EQ(n->GetStr(IDOf(n, L"s")), L"text");
    EXPECT_EQ(n->GetStr(IDOf(n, L"fn")), L"/tmp/a.png");
    EXPECT_EQ(n->GetTexmap(IDOf(n, L"m")), upstream);
    EXPECT_EQ(n->GetMatrix3(IDOf(n, L"mx")),
              Matrix3(Point3(1, 2, 3), Point3(4, 5, 6), Point3(7, 8, 9), Point3(10, 11, 12)));
    EXPECT_EQ(n->GetPoint4(IDOf(n, L"p4")), Point4(1, 2, 3, 4));
    EXPECT_EQ(n->GetAColor(IDOf(n, L"c")), AColor(0.1f, 0.2f, 0.3f, 0.4f));
    EXPECT_EQ(n->GetPoint2(IDOf(n, L"p2")), Point2(5, 6));
    ASSERT_EQ(n->Count(IDOf(n, L"ft")), 3);
    for (int k = 0; k < 3; ++k) EXPECT_FLOAT_EQ(n->GetFloat(IDOf(n, L"ft"), 0, k), 10.0f + k);
    ASSERT_EQ(n->Count(IDOf(n, L"st")), 2);
    EXPECT_EQ(n->GetStr(IDOf(n, L"st"), 0, 1), L"two");
    // Different host types, and table against non-table, are not copied.
    EXPECT_EQ(n->GetInt(IDOf(n, L"typeChange")), 0);
    EXPECT_EQ(n->Count(IDOf(n, L"tabChange")), 1);
    EXPECT_FLOAT_EQ(n->GetFloat(IDOf(n, L"tabChange")), 0.0f);
    // The boolean has no copy rule: reported, the copy went on past it.
    EXPECT_EQ(n->GetInt(IDOf(n, L"b")), 0);
    EXPECT_TRUE(probe.Saw("Unhandled data type in param copying"));
}

TEST_F(CopyShaderParamsTest, SkippingValuesStillCarriesMapsAndControllers) {
    FillOld();
    auto* keys = new LinearFloatControl;
    keys->SetKey(0, 3.0f);
    keys->SetKey(4800, 6.0f);
    ASSERT_TRUE(oldBlock->SetController(IDOf(oldBlock, L"f"), 0, keys));
    MessageProbe probe;
    EXPECT_TRUE(CopyShaderParams(oldBlock, newBlock, true));
    IParamBlock2* n = newBlock;
    EXPECT_EQ(n->GetTexmap(IDOf(n, L"m")), upstream);
    EXPECT_EQ(n->GetController(IDOf(n, L"f")), keys);
    EXPECT_FLOAT_EQ(n->GetFloat(IDOf(n, L"f"), 2400), 4.5f);
    EXPECT_EQ(keys->NumKeys(), 2); // carrying the controller did not key it
    EXPECT_EQ(n->GetInt(IDOf(n, L"i")), 0);
    EXPECT_EQ(n->GetStr(IDOf(n, L"s")), L"");
    EXPECT_EQ(n->Count(IDOf(n, L"ft")), 1);
    EXPECT_FALSE(probe.Saw("Unhandled data type"));
}

TEST_F(CopyShaderParamsTest, ControllersAreSharedNotCopied) {
    auto* keys = new LinearFloatControl;
    keys->SetKey(0, 1.0f);
    ASSERT_TRUE(oldBlock->SetController(IDOf(oldBlock, L"w"), 0, keys));
    EXPECT_TRUE(CopyShaderParams(oldBlock, newBlock, false));
    EXPECT_EQ(newBlock->GetController(IDOf(newBlock, L"w")), keys);
    EXPECT_EQ(keys->NumKeys(), 1);
    EXPECT_EQ(oldBlock->GetController(IDOf(oldBlock, L"w")), keys);
}

TEST_F(CopyShaderParamsTest, RefusesMissingBlocksAndDegenerateLayouts) {
    EXPECT_FALSE(CopyShaderParams(nullptr, newBlock, false));
    EXPECT_FALSE(CopyShaderParams(oldBlock, nullptr, false));
    EXPECT_TRUE(CopyShaderParams(oldBlock, oldBlock, false));

    ParamBlockDesc2 unnamed(BlockID(1), L"", 0, nullptr, 0);
    unnamed.AddParam(Def(0, L"f", TYPE_FLOAT));
    IParamBlock2* anonymous = CreateParameterBlock2(&unnamed, &owner);
    anonymous->SetValue(0, 0, 9.0f);
    EXPECT_FALSE(CopyShaderParams(anonymous, newBlock, false));
    EXPECT_FLOAT_EQ(newBlock->GetFloat(IDOf(newBlock, L"f")), 0.0f);

    ParamBlockDesc2 empty(BlockID(1), L"empty", 0, nullptr, 0);
    IParamBlock2* nothing = CreateParameterBlock2(&empty, &owner);
    EXPECT_FALSE(CopyShaderParams(oldBlock, nothing, false));
    anonymous->DeleteMe();
    nothing->DeleteMe();
}

TEST(InitArrayDefaults, FillsTablesFromTheShadersArrayDefaults) {
    MapTestRoot();
    MapHolder map;
    map.SetCode("shader arrays(\n"
                "    float fa[] = {1, 2, 3},\n"
                "    int ia[2] = {4, 5},\n"
                "    color ca[2] = {color(1, 0, 0), color(0, 1, 0)},\n"
                "    point pa[1] = {point(1, 2, 3)},\n"
                "    string sa[2] = {\"x\", \"y\"},\n"
                "    output color Out = 0) { Out = ca[0] * fa[1]; }\n");
    IParamBlock2* pb = map->ShaderBlock();
    ASSERT_NE(pb, nullptr);
    ASSERT_EQ(map->GetShaderName(), L"arrays");
    const ParamID fa = IDOf(pb, L"fa"), ia = IDOf(pb, L"ia"), ca = IDOf(pb, L"ca"),
                  pa = IDOf(pb, L"pa"), sa = IDOf(pb, L"sa");
    ASSERT_EQ(pb->Count(fa), 3);
    for (int k = 0; k < 3; ++k) EXPECT_FLOAT_EQ(pb->GetFloat(fa, 0, k), 1.0f + k);
    ASSERT_EQ(pb->Count(ia), 2);
    EXPECT_EQ(pb->GetInt(ia, 0, 1), 5);
    ASSERT_EQ(pb->Count(ca), 2);
    EXPECT_EQ(pb->GetAColor(ca, 0, 1), AColor(0, 1, 0, 1));
    EXPECT_EQ(pb->GetPoint3(pa, 0, 0), Point3(1, 2, 3));
    ASSERT_EQ(pb->Count(sa), 2);
    EXPECT_EQ(pb->GetStr(sa, 0, 1), L"y");

    // A user's table value survives an edit that keeps the array.
    pb->SetValue(fa, 0, 9.0f, 2);
    map.SetCode("shader arrays(\n"
                "    float fa[] = {1, 2, 3},\n"
                "    output color Out = 0) { Out = fa[2]; }\n");
    pb = map->ShaderBlock();
    EXPECT_FLOAT_EQ(pb->GetFloat(IDOf(pb, L"fa"), 0, 2), 9.0f);
}

TEST(InitArrayDefaults, ReportsTextThatCannotBeQueried) {
    MapTestRoot();
    ParamBlockDesc2 d(BlockID(1), L"tables", 0, nullptr, 0);
    d.AddParam(Def(0, L"t", TYPE_FLOAT_TAB));
    PlainOwner owner;
    IParamBlock2* pb = CreateParameterBlock2(&d, &owner);
    MessageProbe probe;
    InitArrayDefaults(0x1234567ull, pb); // no shader recorded under this key
    EXPECT_TRUE(probe.Saw("ERROR querying shader ("));
    EXPECT_EQ(pb->Count(0), 1);
    pb->DeleteMe();
}
