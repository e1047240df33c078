// OSOInfo: names, labels, types with struct folding, outputs, metadata and the shader block
// descriptor for every type, in save formats 20200, 20191 and 20190.
#include "compile/oso_info.h"
#include "scratch_host.h"

#include <OSL/oslcomp.h>
#include <trelm/log/render_message_manager.h>
#include <trelm/log/system_log.h>

#include <gtest/gtest.h>

namespace {

using OSL::TypeDesc;

class Collecting : public OIIO::ErrorHandler {
public:
    void operator()(int, const std::string& msg) override { messages += msg + "\n"; }
    std::string messages;
};

std::string CompileToOso(const std::string& source) {
    Collecting errors;
    OSL::OSLCompiler compiler(&errors);
    std::string oso;
    EXPECT_TRUE(compiler.compile_buffer(source, oso, {})) << errors.messages;
    return oso;
}

std::shared_ptr<OSOInfo> Describe(const std::string& oso, int format = kShaderFormatCurrent) {
    return std::make_shared<OSOInfo>(oso, SourceKeyOf(oso), format);
}

const ParamDef& Entry(const OSOInfo& info, int id) {
    const ParamDef* def = info.blockDesc->GetParamDef(static_cast<ParamID>(id));
    if (!def) throw std::runtime_error("no block entry " + std::to_string(id));
    return *def;
}

bool HasEntry(const OSOInfo& info, int id) {
    return info.blockDesc && info.blockDesc->GetParamDef(static_cast<ParamID>(id)) != nullptr;
}

// Every scalar and array type the compiler writes for parameters.
const char* kTypesSource = R"(
shader types(
    int count = 3 [[ int min = -2, int max = 7, string widget = "checkBox", string label = "Count" ]],
    int mode = 1 [[ string widget = "mapper", int connectable = 0 ]],
    int flag = 0 [[ string widget = "checkbox" ]],
    int ints[2] = {4, 5},
    float f = 1.5 [[ float min = 0, float max = 2, float step = 0.1 ]],
    float dist = 2 [[ int worldunits = 1 ]],
    float fa[4] = {1, 2},
    float fu[] = {1, 2, 3},
    float wa[2] = {1, 2} [[ int worldunits = 1 ]],
    color c = color(0.1, 0.2, 0.3) [[ float min = 0, float max = 1 ]],
    point p = point(1, 2, 3),
    vector vec = vector(4, 5, 6),
    normal nn = normal(0, 0, 1),
    color ca[] = {color(1, 0, 0), color(0, 1, 0)},
    matrix m = matrix(1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16),
    string file = "tex.png" [[ string widget = "filename" ]],
    string name = "hello",
    string names[2] = {"a", "b"},
    float computed = u,
    closure color cc = 0,
    output color Out = 0,
    output float Alpha = 1)
{
    Out = c;
}
)";

enum TypesIndex {
    kCount,
    kMode,
    kFlag,
    kInts,
    kF,
    kDist,
    kFa,
    kFu,
    kWa,
    kC,
    kP,
    kV,
    kNn,
    kCa,
    kM,
    kFile,
    kName,
    kNames,
    kComputed,
    kCc,
    kOut,
    kAlpha,
    kTypesN
};

class OSOInfoTest : public ::testing::Test {
protected:
    void SetUp() override { ScratchHostRoot(); }
};

} // namespace

TEST_F(OSOInfoTest, NamesTypesAndOutputs) {
    auto info = Describe(CompileToOso(kTypesSource));
    ASSERT_NE(info->blockDesc, nullptr);
    EXPECT_EQ(info->shaderName, "types");
    ASSERT_EQ(info->types.size(), static_cast<size_t>(kTypesN));
    ASSERT_EQ(info->names.size(), 2u * kTypesN);
    ASSERT_EQ(info->labels.size(), 2u * kTypesN);
    EXPECT_EQ(info->names[kCount], L"count");
    EXPECT_EQ(info->labels[kCount], L"Count");
    EXPECT_EQ(info->labels[kF], L"f");
    EXPECT_EQ(info->outputNames, (std::vector<MSTR>{L"Out", L"Alpha"}));
    EXPECT_EQ(info->outputIndices, (std::vector<std::int32_t>{kOut, kAlpha}));
    EXPECT_EQ(info->types[kFa], TypeDesc(TypeDesc::FLOAT, 4));
    EXPECT_EQ(info->types[kC], OSL::TypeColor);
    EXPECT_EQ(info->blockDesc->ID(), 1);
    EXPECT_EQ(info->blockDesc->InternalName(), L"types");
    EXPECT_EQ(info->blockDesc->Flags(), 0x4400);
    EXPECT_EQ(info->blockDesc->LocalNameID(), 12);
    // Outputs get neither a value nor a companion.
    EXPECT_FALSE(HasEntry(*info, kOut));
    EXPECT_FALSE(HasEntry(*info, kTypesN + kOut));
}

TEST_F(OSOInfoTest, IntegerEntries) {
    auto info = Describe(CompileToOso(kTypesSource));
    const ParamDef& count = Entry(*info, kCount);
    EXPECT_EQ(count.type, 1);
    EXPECT_EQ(count.flags, 0x9);
    EXPECT_EQ(count.def.Get<int>(), 3);
    EXPECT_TRUE(count.has_range);
    EXPECT_EQ(count.range_low, -2);
    EXPECT_EQ(count.range_high, 7);
    EXPECT_EQ(count.ctrl_type, 2);
    EXPECT_EQ(count.int_name, L"count");
    EXPECT_EQ(count.local_name, 0);
    EXPECT_EQ(count.accessor, info->accessor.get());
    EXPECT_EQ(Entry(*info, kFlag).ctrl_type, 2);
    const ParamDef& mode = Entry(*info, kMode);
    EXPECT_EQ(mode.ctrl_type, 23);
    EXPECT_EQ(mode.range_low, -1000000);
    EXPECT_EQ(mode.range_high, 1000000);
    const ParamDef& ints = Entry(*info, kInts);
    EXPECT_EQ(ints.type, 2049);
    EXPECT_EQ(ints.flags, 0x9);
    EXPECT_EQ(ints.tab_size, 2);
    EXPECT_EQ(ints.def.Get<int>(), 4);
    EXPECT_EQ(ints.ctrl_type, -1) << "arrays get no UI tag";
}

TEST_F(OSOInfoTest, FloatEntriesWithStepAndWorldUnits) {
    auto info = Describe(CompileToOso(kTypesSource));
    const ParamDef& f = Entry(*info, kF);
    EXPECT_EQ(f.type, 0);
    EXPECT_EQ(f.flags, 0x9);
    EXPECT_FLOAT_EQ(f.def.Get<float>(), 1.5f);
    EXPECT_EQ(f.range_low, 0);
    EXPECT_EQ(f.range_high, 2);
    EXPECT_EQ(f.ctrl_type, 0);
    EXPECT_EQ(f.edit_type, 1);
    EXPECT_FLOAT_EQ(f.scale, 0.1f);
    EXPECT_FALSE(f.world_units);
    const ParamDef& dist = Entry(*info, kDist);
    EXPECT_EQ(dist.type, 7);
    EXPECT_EQ(dist.edit_type, 2);
    EXPECT_FLOAT_EQ(dist.scale, 0.01f);
    EXPECT_TRUE(dist.world_units);
    EXPECT_FLOAT_EQ(dist.range_low, -1e6f);
    EXPECT_FLOAT_EQ(dist.range_high, 1e6f);
    EXPECT_EQ(Entry(*info, kWa).type, 2055);
}

TEST_F(OSOInfoTest, SizedArrays) {
    auto info = Describe(CompileToOso(kTypesSource));
    const ParamDef& fa = Entry(*info, kFa);
    EXPECT_EQ(fa.type, 2048);
    EXPECT_EQ(fa.tab_size, 4) << "a declared length wins over the defaults given";
    EXPECT_EQ(fa.flags, 0x9);
    EXPECT_FLOAT_EQ(fa.def.Get<float>(), 1.0f);
    EXPECT_EQ(Entry(*info, kFu).tab_size, 3);
    EXPECT_EQ(Entry(*info, kCa).type, 2071);
    EXPECT_EQ(Entry(*info, kCa).tab_size, 2);
    const ParamDef& names = Entry(*info, kNames);
    EXPECT_EQ(names.type, 2056);
    EXPECT_EQ(names.flags, 0x8);
    EXPECT_EQ(names.tab_size, 2);
}

// Unsized array parameters as the reference compiler writes them (type "float[]", the form of
// mergeinstances-vararray's arrayparam in the conformance corpus).
const char* kUnsizedOso =
    "OpenShadingLanguage 1.00\n"
    "# Compiled by oslc 1.12.13.0\n"
    "# options: \n"
    "shader unsized\n"
    "param\tfloat[]\tfu\t1 2 3\t\t%read{0,0} %write{2147483647,-1}\n"
    "param\tcolor[]\tca\t1 0 0 0 1 0\t\t%read{0,0} %write{2147483647,-1}\n"
    "param\tstring[]\tsu\t\"x\"\t\t%read{2147483647,-1} %write{2147483647,-1}\n"
    "oparam\tfloat\tout\t0\t\t%read{2147483647,-1} %write{0,0}\n"
    "const\tint\t$const1\t0\t\t%read{0,0} %write{2147483647,-1}\n"
    "code ___main___\n"
    "\taref\t\tout fu $const1 \t%filename{\"unsized.osl\"} %line{2} %argrw{\"wrr\"}\n"
    "\tend\n";

TEST_F(OSOInfoTest, UnsizedArraysCountTheirDefaults) {
    auto info = Describe(kUnsizedOso);
    ASSERT_NE(info->blockDesc, nullptr);
    EXPECT_EQ(info->types[0], TypeDesc(TypeDesc::FLOAT, -1));
    const ParamDef& fu = Entry(*info, 0);
    EXPECT_EQ(fu.type, 2048);
    EXPECT_EQ(fu.tab_size, 3);
    EXPECT_EQ(fu.flags, 0x1009);
    EXPECT_FLOAT_EQ(fu.def.Get<float>(), 1.0f);
    const ParamDef& ca = Entry(*info, 1);
    EXPECT_EQ(ca.type, 2071);
    EXPECT_EQ(ca.tab_size, 2) << "six defaults of a three-float aggregate";
    EXPECT_EQ(ca.flags, 0x1009);
    EXPECT_EQ(ca.def.Get<TrelmSDK::AColor>(), TrelmSDK::AColor(1, 0, 0, 1));
    const ParamDef& su = Entry(*info, 2);
    EXPECT_EQ(su.type, 2056);
    EXPECT_EQ(su.flags, 0x1008);
    EXPECT_EQ(su.tab_size, 1);
    // 20190 skips them all and their companions.
    auto old = Describe(kUnsizedOso, kShaderFormat20190);
    EXPECT_EQ(old->blockDesc->Count(), 0);
}

TEST_F(OSOInfoTest, TripleEntries) {
    auto info = Describe(CompileToOso(kTypesSource));
    const ParamDef& c = Entry(*info, kC);
    EXPECT_EQ(c.type, 23);
    const auto& col = c.def.Get<TrelmSDK::AColor>();
    EXPECT_FLOAT_EQ(col.r, 0.1f);
    EXPECT_FLOAT_EQ(col.g, 0.2f);
    EXPECT_FLOAT_EQ(col.b, 0.3f);
    EXPECT_FLOAT_EQ(col.a, 1.0f);
    EXPECT_EQ(c.range_low, 0);
    EXPECT_EQ(c.range_high, 1);
    for (int id : {kP, kV, kNn}) {
        SCOPED_TRACE(id);
        EXPECT_EQ(Entry(*info, id).type, 3);
        EXPECT_EQ(Entry(*info, id).ctrl_type, -1);
    }
    const auto& p = Entry(*info, kP).def.Get<TrelmSDK::Point3>();
    EXPECT_EQ(p, TrelmSDK::Point3(1, 2, 3));
}

TEST_F(OSOInfoTest, MatrixAndStringEntries) {
    auto info = Describe(CompileToOso(kTypesSource));
    const ParamDef& m = Entry(*info, kM);
    EXPECT_EQ(m.type, 20);
    EXPECT_FALSE(m.has_range);
    const auto& mat = m.def.Get<TrelmSDK::Matrix3>();
    EXPECT_EQ(mat.GetRow(0), TrelmSDK::Point3(1, 2, 3));
    EXPECT_EQ(mat.GetRow(1), TrelmSDK::Point3(5, 6, 7));
    EXPECT_EQ(mat.GetRow(2), TrelmSDK::Point3(9, 10, 11));
    EXPECT_EQ(mat.GetRow(3), TrelmSDK::Point3(13, 14, 15));
    const ParamDef& file = Entry(*info, kFile);
    EXPECT_EQ(file.type, 9);
    EXPECT_EQ(file.flags, 0x8);
    EXPECT_EQ(file.asset_type, 1);
    EXPECT_EQ(file.def.Get<MSTR>(), L"tex.png");
    const ParamDef& name = Entry(*info, kName);
    EXPECT_EQ(name.type, 8);
    EXPECT_EQ(name.asset_type, 0);
    EXPECT_EQ(name.def.Get<MSTR>(), L"hello");
}

TEST_F(OSOInfoTest, NoValueEntryForClosuresAndComputedDefaultsButACompanion) {
    auto info = Describe(CompileToOso(kTypesSource));
    EXPECT_FALSE(HasEntry(*info, kCc));
    EXPECT_FALSE(HasEntry(*info, kComputed));
    EXPECT_TRUE(HasEntry(*info, kTypesN + kCc));
    EXPECT_TRUE(HasEntry(*info, kTypesN + kComputed));
}

TEST_F(OSOInfoTest, CompanionsWithLabelsAndSubTextureNumbers) {
    auto info = Describe(CompileToOso(kTypesSource));
    // "mode" has connectable 0: no companion in the current format.
    EXPECT_FALSE(HasEntry(*info, kTypesN + kMode));
    EXPECT_TRUE(info->names[kTypesN + kMode].empty());
    const ParamDef& countMap = Entry(*info, kTypesN + kCount);
    EXPECT_EQ(countMap.type, 15);
    EXPECT_EQ(countMap.flags & 0xFF, 0x48);
    EXPECT_EQ(countMap.int_name, L"count_map");
    EXPECT_EQ(countMap.sub_texmap, 0);
    EXPECT_EQ(countMap.accessor, info->accessor.get());
    EXPECT_EQ(info->labels[kTypesN + kCount], L"Count Map");
    EXPECT_EQ(Entry(*info, kTypesN + kFlag).sub_texmap, 1) << "numbers skip the missing one";
    ASSERT_EQ(info->mapNames.size(), info->mapLabels.size());
    ASSERT_EQ(info->mapNames.size(), static_cast<size_t>(kTypesN - 3)); // all inputs but mode
    EXPECT_EQ(info->mapNames[0], L"count_map");
    EXPECT_EQ(info->mapLabels[0], L"Count Map");
    EXPECT_EQ(info->mapNames[1], L"flag_map");
    // The accessor names entries by their labels.
    EXPECT_EQ(info->blockDesc->GetLocalName(kCount), L"Count");
    EXPECT_EQ(info->blockDesc->GetLocalName(kTypesN + kCount), L"Count Map");
}

TEST_F(OSOInfoTest, Format20190IgnoresArraysMatricesAndConnectable) {
    const std::string oso = CompileToOso(kTypesSource);
    auto old = Describe(oso, kShaderFormat20190);
    EXPECT_FALSE(HasEntry(*old, kInts));
    EXPECT_FALSE(HasEntry(*old, kFu));
    EXPECT_FALSE(HasEntry(*old, kM));
    EXPECT_FALSE(HasEntry(*old, kTypesN + kFa)) << "skipped arrays get no companion either";
    EXPECT_TRUE(HasEntry(*old, kTypesN + kM)) << "every other input gets a companion";
    EXPECT_TRUE(HasEntry(*old, kTypesN + kMode)) << "connectable 0 counts from 20191 on";
    EXPECT_TRUE(HasEntry(*old, kF));

    auto mid = Describe(oso, kShaderFormat20191);
    auto cur = Describe(oso, kShaderFormatCurrent);
    ASSERT_EQ(mid->blockDesc->Count(), cur->blockDesc->Count());
    for (int k = 0; k < cur->blockDesc->Count(); ++k) {
        const ParamDef& a = mid->blockDesc->GetParamDefByIndex(k);
        const ParamDef& b = cur->blockDesc->GetParamDefByIndex(k);
        EXPECT_EQ(a.ID, b.ID);
        EXPECT_EQ(a.type, b.type);
        EXPECT_EQ(a.flags, b.flags);
        EXPECT_EQ(a.int_name, b.int_name);
    }
    EXPECT_EQ(mid->mapNames, cur->mapNames);
}

// Struct parameters as the reference compiler writes them when their defaults are constants
// (the form of initlist's custcolor4 in the conformance corpus), for the five folded structs
// and one that is not folded.
const char* kStructOso =
    "OpenShadingLanguage 1.00\n"
    "# Compiled by oslc 1.12.13.0\n"
    "# options: \n"
    "shader folded\n"
    "param\tstruct color4\ttint\t\t\t%read{2147483647,-1} %write{2147483647,-1} "
    "%struct{\"color4\"} %structfields{rgb,a} %structfieldtypes{\"cf\"} %structnfields{2}\n"
    "param\tcolor\ttint.rgb\t0.25 0.5 0.75\t\t%read{2147483647,-1} %write{2147483647,-1} "
    "%mystruct{tint} %mystructfield{0}\n"
    "param\tfloat\ttint.a\t0.125\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{tint} "
    "%mystructfield{1}\n"
    "param\tstruct vector2\tuv\t\t%meta{string,label,\"Coordinates\"} %read{2147483647,-1} "
    "%write{2147483647,-1} %struct{\"vector2\"} %structfields{x,y} %structfieldtypes{\"ff\"} "
    "%structnfields{2}\n"
    "param\tfloat\tuv.x\t1\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{uv} "
    "%mystructfield{0}\n"
    "param\tfloat\tuv.y\t2\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{uv} "
    "%mystructfield{1}\n"
    "param\tstruct color2\tc2\t\t\t%read{2147483647,-1} %write{2147483647,-1} %struct{\"color2\"} "
    "%structfields{r,a} %structfieldtypes{\"ff\"} %structnfields{2}\n"
    "param\tfloat\tc2.r\t0.5\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{c2} "
    "%mystructfield{0}\n"
    "param\tfloat\tc2.a\t0.75\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{c2} "
    "%mystructfield{1}\n"
    "param\tstruct vector4\tv4\t\t\t%read{2147483647,-1} %write{2147483647,-1} "
    "%struct{\"vector4\"} %structfields{x,y,z,w} %structfieldtypes{\"ffff\"} %structnfields{4}\n"
    "param\tfloat\tv4.x\t1\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{v4} "
    "%mystructfield{0}\n"
    "param\tfloat\tv4.y\t2\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{v4} "
    "%mystructfield{1}\n"
    "param\tfloat\tv4.z\t3\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{v4} "
    "%mystructfield{2}\n"
    "param\tfloat\tv4.w\t4\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{v4} "
    "%mystructfield{3}\n"
    "param\tstruct matrix33\tm3\t\t\t%read{2147483647,-1} %write{2147483647,-1} "
    "%struct{\"matrix33\"} %structfields{m} %structfieldtypes{\"m\"} %structnfields{1}\n"
    "param\tmatrix\tm3.m\t1 2 3 0 4 5 6 0 7 8 9 0 0 0 0 1\t\t%read{2147483647,-1} "
    "%write{2147483647,-1} %mystruct{m3} %mystructfield{0}\n"
    "param\tstruct custcolor4\tci1\t\t\t%read{2147483647,-1} %write{2147483647,-1} "
    "%struct{\"custcolor4\"} %structfields{rgb,a} %structfieldtypes{\"cf\"} %structnfields{2}\n"
    "param\tcolor\tci1.rgb\t8 7 6\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{ci1} "
    "%mystructfield{0}\n"
    "param\tfloat\tci1.a\t5\t\t%read{2147483647,-1} %write{2147483647,-1} %mystruct{ci1} "
    "%mystructfield{1}\n"
    "oparam\tcolor\tCout\t0 0 0\t\t%read{2147483647,-1} %write{0,0}\n"
    "code ___main___\n"
    "\tassign\t\tCout tint.rgb \t%filename{\"folded.osl\"} %line{3} %argrw{\"wr\"}\n"
    "\tend\n";

enum StructIndex {
    kTint = 0,
    kUv = 3,
    kC2 = 6,
    kV4 = 9,
    kM3 = 14,
    kCi1 = 16,
    kCi1Rgb = 17,
    kCi1A = 18,
    kCout = 19,
    kStructN = 20
};

TEST_F(OSOInfoTest, FoldedStructsBecomeOneValue) {
    auto info = Describe(kStructOso);
    ASSERT_NE(info->blockDesc, nullptr);
    ASSERT_EQ(info->types.size(), static_cast<size_t>(kStructN));
    EXPECT_EQ(info->types[kTint], TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC4, TypeDesc::COLOR));
    EXPECT_EQ(info->types[kUv], TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC2, TypeDesc::VECTOR));
    EXPECT_EQ(info->types[kC2], TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC2, TypeDesc::COLOR));
    EXPECT_EQ(info->types[kV4], TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC4, TypeDesc::VECTOR));
    EXPECT_EQ(info->types[kM3], TypeDesc(TypeDesc::FLOAT, TypeDesc::MATRIX33, TypeDesc::VECTOR));

    const ParamDef& tint = Entry(*info, kTint);
    EXPECT_EQ(tint.type, 23);
    EXPECT_EQ(tint.int_name, L"tint");
    const auto& c = tint.def.Get<TrelmSDK::AColor>();
    EXPECT_EQ(c, TrelmSDK::AColor(0.25f, 0.5f, 0.75f, 0.125f));
    EXPECT_FALSE(HasEntry(*info, kTint + 1));
    EXPECT_FALSE(HasEntry(*info, kTint + 2));
    EXPECT_EQ(Entry(*info, kStructN + kTint).int_name, L"tint_map");
    EXPECT_FALSE(HasEntry(*info, kStructN + kTint + 1));

    const ParamDef& uv = Entry(*info, kUv);
    EXPECT_EQ(uv.type, 30);
    EXPECT_EQ(uv.def.Get<TrelmSDK::Point2>(), TrelmSDK::Point2(1, 2));
    EXPECT_EQ(info->labels[kUv], L"Coordinates");
    EXPECT_EQ(info->labels[kStructN + kUv], L"Coordinates Map");
    EXPECT_EQ(Entry(*info, kC2).def.Get<TrelmSDK::Point2>(), TrelmSDK::Point2(0.5f, 0.75f));
    const ParamDef& v4 = Entry(*info, kV4);
    EXPECT_EQ(v4.type, 22);
    EXPECT_EQ(v4.def.Get<TrelmSDK::Point4>(), TrelmSDK::Point4(1, 2, 3, 4));
    const ParamDef& m3 = Entry(*info, kM3);
    EXPECT_EQ(m3.type, 20);
    EXPECT_EQ(m3.def.Get<TrelmSDK::Matrix3>().GetRow(1), TrelmSDK::Point3(4, 5, 6));
    EXPECT_EQ(m3.def.Get<TrelmSDK::Matrix3>().GetRow(3), TrelmSDK::Point3(0, 0, 0));
}

TEST_F(OSOInfoTest, OtherStructsYieldTheirFields) {
    auto info = Describe(kStructOso);
    EXPECT_FALSE(HasEntry(*info, kCi1));
    EXPECT_FALSE(HasEntry(*info, kStructN + kCi1));
    const ParamDef& rgb = Entry(*info, kCi1Rgb);
    EXPECT_EQ(rgb.int_name, L"ci1.rgb");
    EXPECT_EQ(rgb.type, 23);
    EXPECT_EQ(Entry(*info, kCi1A).type, 0);
    EXPECT_EQ(Entry(*info, kStructN + kCi1Rgb).int_name, L"ci1.rgb_map");
    EXPECT_EQ(Entry(*info, kStructN + kCi1A).int_name, L"ci1.a_map");
    EXPECT_EQ(info->outputIndices, std::vector<std::int32_t>{kCout});
}

TEST_F(OSOInfoTest, Format20190SkipsStructsWithTheirFields) {
    auto info = Describe(kStructOso, kShaderFormat20190);
    for (int i = 0; i < kCout; ++i) {
        SCOPED_TRACE(i);
        EXPECT_FALSE(HasEntry(*info, i));
        EXPECT_FALSE(HasEntry(*info, kStructN + i));
    }
    EXPECT_EQ(info->outputIndices, std::vector<std::int32_t>{kCout});
}

TEST_F(OSOInfoTest, MetadataTextForEveryValueType) {
    auto info = Describe(CompileToOso(R"(
shader meta [[ string help = "Helps", int version = 3, float scale = 0.1 ]] (
    float a = 1 [[ float min = 0.333333333, string label = "First", string label = "Second" ]],
    int b = 2 [[ int range[2] = {4, 5} ]],
    output float o = 0) { o = a + b; })"));
    EXPECT_EQ(info->metadata.at("").at("help"), "Helps");
    EXPECT_EQ(info->metadata.at("").at("version"), "3");
    EXPECT_EQ(info->metadata.at("").at("scale"), "0.1");
    EXPECT_EQ(info->metadata.at("a").at("min"), "0.333333");
    EXPECT_EQ(info->metadata.at("a").at("label"), "Second") << "a later item replaces";
    EXPECT_EQ(info->labels[0], L"Second");
    EXPECT_EQ(info->metadata.at("b").at("range"), "4 5");
}

TEST_F(OSOInfoTest, ShaderWithoutOutputGetsThePlaceholder) {
    auto& render = TrelmSDK::GetRenderMessageManager().Messages();
    const auto before = render.LastSequence();
    auto info = Describe(CompileToOso("shader nothing_out(float a = 1) { }\n"));
    EXPECT_EQ(info->outputNames, std::vector<MSTR>{L"NO VALID OUTPUT"});
    EXPECT_EQ(info->outputIndices, std::vector<std::int32_t>{-1});
    auto sent = render.Since(before);
    ASSERT_EQ(sent.size(), 1u);
    EXPECT_EQ(sent[0].source, 1);
    EXPECT_EQ(sent[0].type, 2u);
    EXPECT_EQ(sent[0].systemLogType, 1u);
    EXPECT_NE(sent[0].text.find("nothing_out"), std::string::npos);
    EXPECT_TRUE(HasEntry(*info, 0));
}

TEST_F(OSOInfoTest, QueryErrorsAreReportedAndLeaveAnEmptyDescription) {
    auto& render = TrelmSDK::GetRenderMessageManager().Messages();
    const auto before = render.LastSequence();
    auto info = Describe("this is not OSO text");
    EXPECT_EQ(info->blockDesc, nullptr);
    EXPECT_TRUE(info->names.empty());
    EXPECT_TRUE(info->outputNames.empty());
    EXPECT_EQ(info->osoText, "this is not OSO text");
    bool reported = false;
    for (const auto& m : render.Since(before))
        reported |=
            m.text.rfind("ERROR querying shader (", 0) == 0 && m.type == 2 && m.text.back() == ')';
    EXPECT_TRUE(reported);
}

TEST_F(OSOInfoTest, AccessorForgetsItsDescription) {
    auto info = Describe(CompileToOso(kTypesSource));
    auto desc = info->blockDesc;
    auto accessor = info->accessor;
    EXPECT_EQ(accessor->GetLocalName(nullptr, kCount, 0), L"Count");
    EXPECT_EQ(accessor->GetLocalName(nullptr, 9999, 0), L"");
    info.reset();
    EXPECT_EQ(accessor->GetLocalName(nullptr, kCount, 0), L"");
}

// The same layouts compiled from source. They run once the compiler writes constant struct
// defaults and unsized array types as the reference compiler does.
TEST_F(OSOInfoTest, FoldedStructCompiledFromSource) {
    const std::string oso = CompileToOso("#include \"color4.h\"\n"
                                         "shader folded_src(color4 tint = {color(0.25, 0.5, 0.75),"
                                         " 0.125}, output color Cout = 0) { Cout = tint.rgb; }\n");
    if (oso.find("tint.rgb\t0.25 0.5 0.75\t") == std::string::npos ||
        oso.find("%initexpr") != std::string::npos)
        GTEST_SKIP() << "the compiler writes struct defaults as init expressions";
    auto info = Describe(oso);
    EXPECT_EQ(Entry(*info, 0).def.Get<TrelmSDK::AColor>(),
              TrelmSDK::AColor(0.25f, 0.5f, 0.75f, 0.125f));
    EXPECT_EQ(Entry(*info, 4).int_name, L"tint_map");
}

TEST_F(OSOInfoTest, FoldedStructWithoutConstantDefaultGetsOnlyACompanion) {
    const std::string oso = CompileToOso("#include \"color4.h\"\n"
                                         "shader folded_expr(color4 tint = {color(u), 1},"
                                         " output color Cout = 0) { Cout = tint.rgb; }\n");
    auto info = Describe(oso);
    ASSERT_NE(info->blockDesc, nullptr);
    EXPECT_EQ(info->types[0], TypeDesc(TypeDesc::FLOAT, TypeDesc::VEC4, TypeDesc::COLOR));
    EXPECT_FALSE(HasEntry(*info, 0));
    EXPECT_TRUE(HasEntry(*info, 4));
    EXPECT_FALSE(HasEntry(*info, 1));
    EXPECT_FALSE(HasEntry(*info, 5));
}

TEST_F(OSOInfoTest, UnsizedArrayCompiledFromSource) {
    const std::string oso = CompileToOso(
        "shader unsized_src(float fu[] = {1, 2, 3}, output float o = 0) { o = fu[0]; }\n");
    ASSERT_NE(oso.find("float[]\tfu"), std::string::npos) << oso;
    auto info = Describe(oso);
    EXPECT_EQ(Entry(*info, 0).tab_size, 3);
    EXPECT_EQ(Entry(*info, 0).flags, 0x1009);
}
