#include "params_test_objects.h"

#include <gtest/gtest.h>

#include <memory>

using namespace trelm_test;

TEST(ParamBlockDesc, TaggedListDescribesEveryTypeAndTag) {
    ErrorCapture capture;
    TestClassDesc cd;
    LabelAccessor accessor;
    std::unique_ptr<ParamBlockDesc2> desc(MakeEveryTypeDesc(&cd, &accessor));
    EXPECT_TRUE(capture.errors.empty())
        << (capture.errors.empty() ? "" : ToUTF8(capture.errors[0]));

    EXPECT_EQ(desc->ID(), 1);
    EXPECT_EQ(desc->InternalName(), L"every");
    EXPECT_EQ(desc->Version(), 3);
    EXPECT_EQ(desc->RefNo(), 1);
    EXPECT_EQ(desc->Count(), 24);
    EXPECT_EQ(cd.NumParamBlockDescs(), 1);
    EXPECT_EQ(cd.GetParamBlockDesc(0), desc.get());
    EXPECT_EQ(cd.GetParamBlockDescByID(1), desc.get());

    const ParamDef* f = desc->GetParamDef(kFloat);
    ASSERT_NE(f, nullptr);
    EXPECT_EQ(f->int_name, L"Mixer");
    EXPECT_EQ(f->type, TYPE_FLOAT);
    EXPECT_EQ(f->def.Get<float>(), 0.5f);
    EXPECT_TRUE(f->has_range);
    EXPECT_EQ(f->range_high, 1.0f);
    EXPECT_EQ(f->ctrl_type, TYPE_SPINNER);
    EXPECT_EQ(f->edit_type, EDITTYPE_FLOAT);
    EXPECT_FLOAT_EQ(f->scale, 0.01f);

    EXPECT_EQ(desc->GetParamDef(kInt)->def.Get<int>(), 3);
    EXPECT_EQ(desc->GetParamDef(kInt)->range_low, -1000000.0f);
    EXPECT_EQ(desc->GetParamDef(kInt)->ctrl_type, TYPE_INT_COMBOBOX);
    EXPECT_EQ(desc->GetParamDef(kBool)->def.Get<int>(), 1);
    EXPECT_EQ(desc->GetParamDef(kBool)->ctrl_type, TYPE_SINGLECHECKBOX);
    const ParamDef* w = desc->GetParamDef(kWorld);
    EXPECT_TRUE(w->world_units) << "the raw tag number works like the named tag";
    EXPECT_EQ(w->edit_type, EDITTYPE_UNIVERSE);
    EXPECT_EQ(desc->GetParamDef(kString)->def.Get<MSTR>(), L"hello");
    EXPECT_EQ(desc->GetParamDef(kFilename)->asset_type, 1);
    const ParamDef* m = desc->GetParamDef(kMap);
    EXPECT_EQ(m->sub_texmap, 0);
    EXPECT_EQ(m->flags & P_SUBTEX, P_SUBTEX) << "a sub-texture number marks the parameter";
    EXPECT_EQ(m->accessor, &accessor);
    EXPECT_EQ(desc->GetParamDef(kMatrix)->def.Get<Matrix3>(), TestMatrix());
    EXPECT_EQ(desc->GetParamDef(kPoint4)->def.Get<Point4>(), Point4(1, 2, 3, 4));
    EXPECT_EQ(desc->GetParamDef(kColor)->def.Get<AColor>(), AColor(0.5f, 0.25f, 0.125f, 1));
    EXPECT_EQ(desc->GetParamDef(kPoint2)->def.Get<Point2>(), Point2(0.25f, 0.75f));

    const ParamDef* knots = desc->GetParamDef(kFloatTab);
    EXPECT_TRUE(knots->IsTab());
    EXPECT_EQ(knots->type, 2048);
    EXPECT_EQ(knots->tab_size, 3);
    EXPECT_EQ(knots->flags, P_ANIMATABLE | P_VARIABLE_SIZE);
    EXPECT_EQ(desc->GetParamDef(kColorTab)->type, 2071);
    EXPECT_EQ(desc->GetParamDef(kPoint2Tab)->type, 2078);
    EXPECT_EQ(desc->GetParamDef(kMatrixTab)->def.Get<Matrix3>(), Matrix3()) << "zero is identity";

    EXPECT_EQ(desc->IDtoIndex(kFloatTab), 12);
    EXPECT_EQ(desc->IndextoID(12), kFloatTab);
    EXPECT_EQ(desc->IndextoID(99), -1);
    EXPECT_EQ(desc->NameToIndex(L"Tint"), 10);
    EXPECT_EQ(desc->NameToIndex(L"nope"), -1);
}

TEST(ParamBlockDesc, LocalNamesFromResourcesAndAccessors) {
    TestClassDesc cd;
    LabelAccessor accessor;
    std::unique_ptr<ParamBlockDesc2> desc(MakeEveryTypeDesc(&cd, &accessor));
    EXPECT_EQ(desc->GetLocalName(), L"Shader Parameters");
    EXPECT_EQ(desc->GetLocalName(kFloat), L"Mix Amount") << "resource string 13 of the module";
    EXPECT_EQ(desc->GetLocalName(kMap), L"Label 7") << "computed by the accessor";
    EXPECT_EQ(desc->GetLocalName(kInt), L"Count") << "no resource: the internal name";
    EXPECT_EQ(desc->GetLocalName(99), L"");

    PBAccessor base;
    EXPECT_EQ(base.GetLocalName(nullptr, 0, 0), L"") << "the base accessor's name is empty";
}

TEST(ParamBlockDesc, MalformedListsAreReportedAndKeepWhatCameBefore) {
    ErrorCapture capture;
    TestClassDesc cd;
    ParamBlockDesc2 desc(0, L"bad", 0, &cd, 0, 0, L"A", TYPE_FLOAT, 0, 0, p_default, 1.0f, p_end, 1,
                         L"B", TYPE_FLOAT, 0, 0, 0xC0000777, p_end, 2, L"C", TYPE_FLOAT, 0, 0,
                         p_end, p_end);
    EXPECT_EQ(desc.Count(), 1) << "parsing stops at the unknown tag";
    ASSERT_EQ(capture.errors.size(), 1u);
    EXPECT_NE(capture.errors[0].find(L"unknown tag 0xC0000777"), MSTR::npos);

    EXPECT_FALSE(desc.AddParam(0, L"A2", TYPE_INT, 0, 0)) << "ID in use";
    EXPECT_FALSE(desc.AddParam(3, L"D", TYPE_INT, 0, 0, p_default, L"text")) << "wrong default";
    EXPECT_FALSE(desc.AddParam(4, L"E", 99, 0, 0)) << "unknown type";
    EXPECT_FALSE(desc.AddParam(5, L"F", TYPE_STRING, 0, 0, p_range, 0, 1)) << "range of text";
    EXPECT_FALSE(desc.AddParam(6, L"G", TYPE_FLOAT, 0, 0, p_subtexno, 1)) << "not a map";
    EXPECT_FALSE(desc.AddParam(7, L"H", TYPE_FLOAT_TAB, 0, 0))
        << "no local name after the table size";
    EXPECT_FALSE(desc.AddParam(8, L"I", TYPE_FLOAT, 0, 0, p_ui, TYPE_SPINNER)) << "spinner args";
    EXPECT_EQ(desc.Count(), 1);
    EXPECT_EQ(capture.errors.size(), 8u);

    ParamBlockDesc2 noVersion(0, L"v", 0, nullptr, P_VERSION);
    EXPECT_EQ(capture.errors.size(), 9u);
}

TEST(ParamBlockDesc, BuiltParameterByParameter) {
    TestClassDesc cd;
    ParamBlockDesc2 desc(1, L"Example", 12, &cd, 0x4400, 0, p_end);
    EXPECT_EQ(desc.Flags(), P_VERSION | P_AUTO_UI_QT);
    EXPECT_EQ(desc.Count(), 0);
    EXPECT_TRUE(desc.AddParam(0, L"Input_A", TYPE_FRGBA, 0x9, 0));
    EXPECT_TRUE(desc.ParamOption(0, p_default, AColor(0.5f, 0.5f, 0.5f, 1)));
    EXPECT_TRUE(desc.ParamOption(0, p_range, -1e6, 1e6));
    EXPECT_FALSE(desc.ParamOption(9, p_default, 1.0f));

    ParamDef def;
    def.ID = 5;
    def.int_name = L"Input_A_map";
    def.type = TYPE_TEXMAP;
    def.flags = 0x48;
    def.sub_texmap = 0;
    EXPECT_TRUE(desc.AddParam(def));
    EXPECT_EQ(desc.GetParamDef(5)->flags, 0x48 | P_SUBTEX);
    EXPECT_EQ(desc.GetParamDef(0)->def.Get<AColor>(), AColor(0.5f, 0.5f, 0.5f, 1));

    // A block made before a parameter was added follows the descriptor.
    IParamBlock2* pb = CreateParameterBlock2(&desc, nullptr);
    EXPECT_TRUE(desc.AddParam(1, L"Mixer", TYPE_FLOAT, 0x9, 0, p_default, 0.5f));
    EXPECT_EQ(pb->NumParams(), 3);
    EXPECT_EQ(pb->GetFloat(1), 0.5f);
    EXPECT_TRUE(desc.DeleteParam(1));
    EXPECT_EQ(pb->Count(1), -1);
    pb->DeleteMe();
}

TEST(ClassDesc2, DescriptorListAndAutomaticBlocks) {
    ErrorCapture capture;
    TestClassDesc cd;
    auto fixed = std::make_unique<ParamBlockDesc2>(0, L"params", 0, &cd, 0x402, 0, 1, 3, L"OSLCode",
                                                   TYPE_STRING, 0, 13, p_default,
                                                   L"shader Example() {}", p_end, p_end);
    EXPECT_EQ(fixed->RefNo(), 1);
    EXPECT_EQ(cd.GetParamBlockDesc(1), nullptr);
    ASSERT_EQ(capture.errors.size(), 1u);
    EXPECT_EQ(capture.errors[0], L"Invalid index passed into a Trelm SDK Tab::operator[]");
    EXPECT_EQ(cd.GetParamBlockDescByName(L"params"), fixed.get());

    auto* owner = new Owner(3);
    cd.MakeAutoParamBlocks(owner);
    IParamBlock2* pb = owner->Block(1);
    ASSERT_NE(pb, nullptr);
    EXPECT_EQ(pb->GetOwner(), owner);
    EXPECT_EQ(pb->GetStr(3), L"shader Example() {}");
    EXPECT_EQ(owner->GetParamBlockByID(0), nullptr) << "Owner does not list its blocks";

    cd.ClearParamBlockDescs();
    EXPECT_EQ(cd.NumParamBlockDescs(), 0);
    owner->DeleteMe();
    fixed.reset();
}
