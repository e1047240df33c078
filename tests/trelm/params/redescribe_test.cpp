#include "params_test_objects.h"

#include <trelm/params/keyframe_control.h>

#include <gtest/gtest.h>

using namespace trelm_test;

// A block stored under one layout is re-described with another (an older save format of the same
// shader) so that its values can be read by that layout's IDs and names.
TEST(Redescribe, ValuesAreReadUnderTheNewLayout) {
    ErrorCapture capture;
    int live = 0;
    ParamBlockDesc2 saved(1, L"Shader", 0, nullptr, 0, 0, L"Amount", TYPE_FLOAT, P_ANIMATABLE, 0,
                          p_default, 0.5f, p_end, 1, L"Count", TYPE_INT, 0, 0, p_default, 1, p_end,
                          2, L"File", TYPE_STRING, 0, 0, p_end, 3, L"Ramp", TYPE_FLOAT_TAB, 2, 0, 0,
                          p_end, 4, L"Gone", TYPE_FLOAT, 0, 0, p_end, 5, L"Amount_map", TYPE_TEXMAP,
                          0x48, 0, p_subtexno, 0, p_end, 6, L"Old_map", TYPE_TEXMAP, 0x48, 0,
                          p_subtexno, 1, p_end, p_end);
    ParamBlockDesc2 current(1, L"Shader", 0, nullptr, 0, 0, L"Amount", TYPE_WORLD, P_ANIMATABLE, 0,
                            p_default, 0.1f, p_end, 1, L"Count", TYPE_FLOAT, 0, 0, p_default, 9.0f,
                            p_end, 2, L"File", TYPE_FILENAME, 0, 0, p_end, 3, L"Ramp",
                            TYPE_FLOAT_TAB, 0, 0, 0, p_end, 5, L"Amount_map", TYPE_TEXMAP, 0x48, 0,
                            p_subtexno, 0, p_end, 7, L"New", TYPE_POINT3, 0, 0, p_default,
                            Point3(1, 1, 1), p_end, p_end);
    ASSERT_TRUE(capture.errors.empty());

    auto* owner = new Owner(2);
    IParamBlock2* pb = CreateParameterBlock2(&saved, owner);
    owner->ReplaceReference(0, pb);
    auto* ctrl = new LinearFloatControl();
    ctrl->SetKey(0, 2.0f);
    ctrl->SetKey(100, 4.0f);
    auto* kept = new TestMap(&live);
    auto* dropped = new TestMap(&live);
    pb->SetController(0, 0, ctrl);
    pb->SetValue(1, 0, 4);
    pb->SetValue(2, 0, L"wood.png");
    pb->SetCount(3, 4);
    pb->SetValue(3, 0, 0.3f, 3);
    pb->SetValue(5, 0, kept);
    pb->SetValue(6, 0, dropped);

    const int changes = owner->changes;
    ASSERT_TRUE(pb->Redescribe(&current));
    EXPECT_GT(owner->changes, changes);
    EXPECT_EQ(pb->GetDesc(), &current);
    EXPECT_EQ(pb->NumParams(), 6);
    EXPECT_EQ(pb->GetController(0), ctrl) << "float and world values are stored alike";
    EXPECT_FLOAT_EQ(pb->GetFloat(0, 50), 3.0f);
    EXPECT_EQ(pb->GetFloat(1), 9.0f) << "an integer read as a float is a different value: default";
    EXPECT_EQ(pb->GetStr(2), L"wood.png") << "strings and file names are stored alike";
    EXPECT_EQ(pb->Count(3), 4) << "tables keep their count";
    EXPECT_FLOAT_EQ(pb->GetFloat(3, 0, 3), 0.3f);
    EXPECT_EQ(pb->GetTexmap(5), kept);
    EXPECT_EQ(pb->GetPoint3(7), Point3(1, 1, 1)) << "new parameters take their defaults";
    EXPECT_EQ(pb->Count(4), -1);
    EXPECT_EQ(live, 1) << "the map of a parameter the new layout lacks is released";
    EXPECT_EQ(pb->NumRefs(), 1 + 1 + 1 + 4 + 1 + 1);

    // Read it back under the old layout again: what the new layout dropped is gone.
    ASSERT_TRUE(pb->Redescribe(&saved));
    EXPECT_EQ(pb->GetInt(1), 1);
    EXPECT_EQ(pb->GetTexmap(6), nullptr);
    EXPECT_EQ(pb->GetTexmap(5), kept);
    EXPECT_FALSE(pb->Redescribe(nullptr));
    owner->DeleteMe();
    EXPECT_EQ(live, 0);
}
