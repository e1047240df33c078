#include "params_test_objects.h"

#include <trelm/params/expression_control.h>
#include <trelm/params/keyframe_control.h>

#include <gtest/gtest.h>

#include <memory>

using namespace trelm_test;

TEST(CloneBlock, ValuesControllersAndSharedMapsThroughTheRemapDirectory) {
    TestClassDesc cd;
    LabelAccessor accessor;
    std::unique_ptr<ParamBlockDesc2> desc(MakeEveryTypeDesc(&cd, &accessor));
    int live = 0;
    auto* owner = new Owner(2);
    cd.MakeAutoParamBlocks(owner);
    IParamBlock2* pb = owner->Block(1);
    auto* shared = new TestMap(&live, 0.3f);
    pb->SetValue(kMap, 0, shared);
    pb->SetValue(kMapTab, 0, shared, 1);
    pb->SetValue(kString, 0, L"copied");
    pb->SetCount(kFloatTab, 5);
    pb->SetValue(kFloatTab, 0, 6.0f, 4);
    auto* keys = new LinearFloatControl();
    keys->SetKey(0, 0.0f);
    keys->SetKey(100, 1.0f);
    pb->SetController(kFloat, 0, keys);
    auto* expr = new ExprFloatControl();
    expr->SetExpression(L"F");
    pb->SetController(kInt, 0, expr);

    RemapDir remap;
    auto* copy = static_cast<IParamBlock2*>(remap.CloneRef(pb));
    remap.Backpatch();
    ASSERT_NE(copy, nullptr);
    EXPECT_EQ(copy->GetOwner(), nullptr) << "its owner is whoever references the copy";
    auto* newOwner = new Owner(2);
    newOwner->ReplaceReference(1, copy);
    EXPECT_EQ(copy->GetOwner(), newOwner);

    EXPECT_EQ(copy->GetStr(kString), L"copied");
    EXPECT_EQ(copy->Count(kFloatTab), 5);
    EXPECT_EQ(copy->GetFloat(kFloatTab, 0, 4), 6.0f);
    Texmap* m1 = copy->GetTexmap(kMap);
    ASSERT_NE(m1, nullptr);
    EXPECT_NE(m1, shared);
    EXPECT_EQ(copy->GetTexmap(kMapTab, 0, 1), m1) << "one map in two slots is cloned once";
    EXPECT_EQ(live, 2);
    EXPECT_NE(copy->GetController(kFloat), keys);
    EXPECT_FLOAT_EQ(copy->GetFloat(kFloat, 50), 0.5f);
    EXPECT_EQ(copy->GetInt(kInt, 1600), 10);

    // The copy's animation is its own.
    keys->SetKey(100, 3.0f);
    EXPECT_FLOAT_EQ(copy->GetFloat(kFloat, 100), 1.0f);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 100), 3.0f);

    owner->DeleteMe();
    EXPECT_EQ(live, 1);
    newOwner->DeleteMe();
    EXPECT_EQ(live, 0);
}
