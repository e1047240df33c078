#include "params_test_objects.h"

#include <trelm/params/keyframe_control.h>

#include <gtest/gtest.h>

#include <memory>

using namespace trelm_test;

namespace {
class ParamBlockTest : public EveryTypeBlockTest {
protected:
    const TimeValue times[3] = {0, 800, -4800};
};
} // namespace

TEST_F(ParamBlockTest, DefaultsOfEveryType) {
    EXPECT_EQ(pb->ID(), 1);
    EXPECT_EQ(pb->GetDesc(), desc.get());
    EXPECT_EQ(pb->NumParams(), 24);
    EXPECT_EQ(pb->GetFloat(kFloat), 0.5f);
    EXPECT_EQ(pb->GetInt(kInt), 3);
    EXPECT_EQ(pb->GetPoint3(kPoint3), Point3(1, 2, 3));
    EXPECT_EQ(pb->GetInt(kBool), 1);
    EXPECT_EQ(pb->GetFloat(kWorld), 2.5f);
    EXPECT_EQ(pb->GetStr(kString), L"hello");
    EXPECT_EQ(pb->GetStr(kFilename), L"");
    EXPECT_EQ(pb->GetTexmap(kMap), nullptr);
    EXPECT_EQ(pb->GetMatrix3(kMatrix), TestMatrix());
    EXPECT_EQ(pb->GetPoint4(kPoint4), Point4(1, 2, 3, 4));
    EXPECT_EQ(pb->GetAColor(kColor), AColor(0.5f, 0.25f, 0.125f, 1));
    EXPECT_EQ(pb->GetPoint2(kPoint2), Point2(0.25f, 0.75f));
    EXPECT_EQ(pb->Count(kFloatTab), 3);
    EXPECT_EQ(pb->GetFloat(kFloatTab, 0, 2), 1.0f);
    EXPECT_EQ(pb->Count(kStringTab), 2);
    EXPECT_EQ(pb->GetStr(kStringTab, 0, 1), L"n");
    EXPECT_EQ(pb->GetAColor(kColorTab, 0, 1), AColor(1, 0, 0, 1));
    EXPECT_EQ(pb->GetPoint4(kPoint4Tab), Point4(0, 0, 0, 0));
    EXPECT_EQ(pb->Count(kFloat), 1);
    EXPECT_EQ(pb->GetLocalName(kMap), L"Label 7");
}

TEST_F(ParamBlockTest, EveryScalarTypeWrittenAndReadAtSeveralTimes) {
    ASSERT_TRUE(pb->SetValue(kFloat, 0, 0.75f));
    ASSERT_TRUE(pb->SetValue(kInt, 0, 42));
    ASSERT_TRUE(pb->SetValue(kPoint3, 0, Point3(-1, 0.5f, 9)));
    ASSERT_TRUE(pb->SetValue(kBool, 0, false));
    ASSERT_TRUE(pb->SetValue(kWorld, 0, 12.0));
    ASSERT_TRUE(pb->SetValue(kString, 0, L"shader Example"));
    ASSERT_TRUE(pb->SetValue(kFilename, 0, MSTR(L"C:\\maps\\wood.<UDIM>.exr")));
    ASSERT_TRUE(pb->SetValue(kMatrix, 0, Inverse(TestMatrix())));
    ASSERT_TRUE(pb->SetValue(kPoint4, 0, Point4(4, 3, 2, 1)));
    ASSERT_TRUE(pb->SetValue(kColor, 0, AColor(0.1f, 0.2f, 0.3f, 0.4f)));
    ASSERT_TRUE(pb->SetValue(kPoint2, 0, Point2(7, 8)));
    for (TimeValue t : times) {
        Interval valid = FOREVER;
        float f = 0;
        int i = 0;
        bool b = true;
        Point3 p3(0, 0, 0);
        MSTR s;
        Matrix3 m;
        Point4 p4(0, 0, 0, 0);
        AColor c(0, 0, 0, 0);
        Point2 p2(0, 0);
        ASSERT_TRUE(pb->GetValue(kFloat, t, f, valid));
        ASSERT_TRUE(pb->GetValue(kInt, t, i, valid));
        ASSERT_TRUE(pb->GetValue(kPoint3, t, p3, valid));
        ASSERT_TRUE(pb->GetValue(kBool, t, b, valid));
        EXPECT_EQ(f, 0.75f);
        EXPECT_EQ(i, 42);
        EXPECT_EQ(p3, Point3(-1, 0.5f, 9));
        EXPECT_FALSE(b);
        ASSERT_TRUE(pb->GetValue(kWorld, t, f, valid));
        EXPECT_EQ(f, 12.0f);
        ASSERT_TRUE(pb->GetValue(kString, t, s, valid));
        EXPECT_EQ(s, L"shader Example");
        ASSERT_TRUE(pb->GetValue(kFilename, t, s, valid));
        EXPECT_EQ(s, L"C:\\maps\\wood.<UDIM>.exr");
        ASSERT_TRUE(pb->GetValue(kMatrix, t, m, valid));
        EXPECT_EQ(m, Inverse(TestMatrix()));
        EXPECT_NEAR((TestMatrix() * m).GetTrans().length(), 0.0f, 1e-5f);
        ASSERT_TRUE(pb->GetValue(kPoint4, t, p4, valid));
        EXPECT_EQ(p4, Point4(4, 3, 2, 1));
        ASSERT_TRUE(pb->GetValue(kColor, t, c, valid));
        EXPECT_EQ(c, AColor(0.1f, 0.2f, 0.3f, 0.4f));
        ASSERT_TRUE(pb->GetValue(kPoint2, t, p2, valid));
        EXPECT_EQ(p2, Point2(7, 8));
        EXPECT_TRUE(valid.IsInfinite()) << "values without controllers hold forever";
    }
}

TEST_F(ParamBlockTest, EveryTableTypeWrittenAndReadPerElement) {
    auto* mapA = new TestMap();
    auto* mapB = new TestMap();
    ASSERT_TRUE(pb->SetValue(kFloatTab, 0, 2.0f, 1));
    ASSERT_TRUE(pb->SetValue(kIntTab, 0, -5, 1));
    ASSERT_TRUE(pb->SetValue(kPoint3Tab, 0, Point3(1, 1, 1), 1));
    ASSERT_TRUE(pb->SetValue(kBoolTab, 0, true, 0));
    ASSERT_TRUE(pb->SetValue(kWorldTab, 0, 3.5f, 0));
    ASSERT_TRUE(pb->SetValue(kStringTab, 0, L"second", 1));
    ASSERT_TRUE(pb->SetValue(kFilenameTab, 0, L"a.png", 0));
    ASSERT_TRUE(pb->SetValue(kMapTab, 0, mapA, 0));
    ASSERT_TRUE(pb->SetValue(kMapTab, 0, mapB, 1));
    ASSERT_TRUE(pb->SetValue(kMatrixTab, 0, TestMatrix(), 0));
    ASSERT_TRUE(pb->SetValue(kPoint4Tab, 0, Point4(1, 1, 1, 1), 0));
    ASSERT_TRUE(pb->SetValue(kColorTab, 0, AColor(0, 1, 0, 1), 0));
    ASSERT_TRUE(pb->SetValue(kPoint2Tab, 0, Point2(2, 3), 0));
    for (TimeValue t : times) {
        EXPECT_EQ(pb->GetFloat(kFloatTab, t, 0), 1.0f);
        EXPECT_EQ(pb->GetFloat(kFloatTab, t, 1), 2.0f);
        EXPECT_EQ(pb->GetInt(kIntTab, t, 0), 7);
        EXPECT_EQ(pb->GetInt(kIntTab, t, 1), -5);
        EXPECT_EQ(pb->GetPoint3(kPoint3Tab, t, 0), Point3(0, 0, 1));
        EXPECT_EQ(pb->GetPoint3(kPoint3Tab, t, 1), Point3(1, 1, 1));
        EXPECT_EQ(pb->GetInt(kBoolTab, t, 0), 1);
        EXPECT_EQ(pb->GetFloat(kWorldTab, t, 0), 3.5f);
        EXPECT_EQ(pb->GetFloat(kWorldTab, t, 1), 10.0f);
        EXPECT_EQ(pb->GetStr(kStringTab, t, 0), L"n");
        EXPECT_EQ(pb->GetStr(kStringTab, t, 1), L"second");
        EXPECT_EQ(pb->GetStr(kFilenameTab, t, 0), L"a.png");
        EXPECT_EQ(pb->GetTexmap(kMapTab, t, 0), mapA);
        EXPECT_EQ(pb->GetTexmap(kMapTab, t, 1), mapB);
        EXPECT_EQ(pb->GetMatrix3(kMatrixTab, t, 0), TestMatrix());
        EXPECT_EQ(pb->GetPoint4(kPoint4Tab, t, 0), Point4(1, 1, 1, 1));
        EXPECT_EQ(pb->GetAColor(kColorTab, t, 0), AColor(0, 1, 0, 1));
        EXPECT_EQ(pb->GetAColor(kColorTab, t, 1), AColor(1, 0, 0, 1));
        EXPECT_EQ(pb->GetPoint2(kPoint2Tab, t, 0), Point2(2, 3));
    }
}

TEST_F(ParamBlockTest, TablesResizeInsertAndDelete) {
    int live = 0;
    auto* map = new TestMap(&live);
    pb->SetValue(kFloatTab, 0, 5.0f, 2);
    ASSERT_TRUE(pb->SetCount(kFloatTab, 5));
    EXPECT_EQ(pb->Count(kFloatTab), 5);
    EXPECT_EQ(pb->GetFloat(kFloatTab, 0, 2), 5.0f) << "kept";
    EXPECT_EQ(pb->GetFloat(kFloatTab, 0, 4), 1.0f) << "new elements take the default";
    ASSERT_TRUE(pb->SetCount(kFloatTab, 2));
    EXPECT_EQ(pb->GetFloat(kFloatTab, 0, 1), 1.0f);
    ASSERT_TRUE(pb->Resize(kFloatTab, 0));
    EXPECT_EQ(pb->Count(kFloatTab), 0);

    ASSERT_TRUE(pb->SetValue(kStringTab, 0, L"b", 1));
    ASSERT_TRUE(pb->Insert(kStringTab, 1, 2));
    EXPECT_EQ(pb->Count(kStringTab), 4);
    EXPECT_EQ(pb->GetStr(kStringTab, 0, 3), L"b");
    ASSERT_TRUE(pb->Delete(kStringTab, 0, 3));
    EXPECT_EQ(pb->Count(kStringTab), 1);
    EXPECT_EQ(pb->GetStr(kStringTab, 0, 0), L"b");

    // Dropping a table element releases its map.
    ASSERT_TRUE(pb->SetValue(kMapTab, 0, map, 1));
    EXPECT_EQ(map->NumStrongDependents(), 1);
    ASSERT_TRUE(pb->SetCount(kMapTab, 1));
    EXPECT_EQ(live, 0);

    ErrorCapture capture;
    EXPECT_FALSE(pb->SetCount(kFloat, 3)) << "not a table";
    EXPECT_FALSE(pb->SetCount(kFloatTab, -1));
    EXPECT_FALSE(pb->Delete(kStringTab, 0, 2));
    EXPECT_FALSE(pb->Insert(kStringTab, 5, 1));
    EXPECT_EQ(pb->Count(kStringTab), 1);
    EXPECT_EQ(capture.errors.size(), 4u);
}

TEST_F(ParamBlockTest, BadInputIsReportedAndChangesNothing) {
    ErrorCapture capture;
    EXPECT_FALSE(pb->SetValue(kFloat, 0, L"text"));
    EXPECT_FALSE(pb->SetValue(kString, 0, 1.0f));
    EXPECT_FALSE(pb->SetValue(kMatrix, 0, Point3(1, 1, 1)));
    EXPECT_FALSE(pb->SetValue(99, 0, 1.0f));
    EXPECT_FALSE(pb->SetValue(kFloatTab, 0, 1.0f, 3));
    EXPECT_FALSE(pb->SetValue(kFloatTab, 0, 1.0f, -1));
    EXPECT_FALSE(pb->SetValue(kMap, 0, static_cast<ReferenceTarget*>(owner)));
    EXPECT_EQ(capture.errors.size(), 7u);
    EXPECT_NE(capture.errors[4].find(L"Invalid index passed into a Trelm SDK Tab::operator[]"),
              MSTR::npos);
    EXPECT_EQ(pb->GetFloat(kFloat), 0.5f);
    EXPECT_EQ(pb->GetStr(kString), L"hello");
    EXPECT_EQ(owner->changes, 0);

    Interval valid = FOREVER;
    MSTR s;
    EXPECT_FALSE(pb->GetValue(kFloat, 0, s, valid)) << "a float is not read as text";
    EXPECT_EQ(pb->GetFloat(99), 0.0f);
    EXPECT_EQ(pb->GetParameterType(99), -1);
}

TEST_F(ParamBlockTest, ConversionsBetweenKindsOnSetAndGet) {
    ASSERT_TRUE(pb->SetValue(kFloat, 0, 2));
    EXPECT_EQ(pb->GetFloat(kFloat), 2.0f);
    ASSERT_TRUE(pb->SetValue(kInt, 0, 2.6f));
    EXPECT_EQ(pb->GetInt(kInt), 3) << "rounded to nearest";
    EXPECT_EQ(pb->GetFloat(kInt), 3.0f);
    ASSERT_TRUE(pb->SetValue(kBool, 0, 5));
    EXPECT_EQ(pb->GetInt(kBool), 1);
    ASSERT_TRUE(pb->SetValue(kColor, 0, Point3(1, 0.5f, 0)));
    EXPECT_EQ(pb->GetAColor(kColor), AColor(1, 0.5f, 0, 1)) << "points become opaque colours";
    EXPECT_EQ(pb->GetPoint3(kColor), Point3(1, 0.5f, 0));
    EXPECT_EQ(pb->GetColor(kColor), Color(1, 0.5f, 0));
    ASSERT_TRUE(pb->SetValue(kPoint4, 0, AColor(1, 2, 3, 4)));
    EXPECT_EQ(pb->GetPoint4(kPoint4), Point4(1, 2, 3, 4));
}

TEST_F(ParamBlockTest, OwnerHearsEveryChangeWithTheParameter) {
    CountingMap ui;
    pb->AddMap(&ui);
    ASSERT_TRUE(pb->SetValue(kStringTab, 0, L"x", 1));
    EXPECT_EQ(owner->changes, 1);
    EXPECT_EQ(owner->lastTarget, pb);
    EXPECT_EQ(owner->lastParam, kStringTab);
    EXPECT_EQ(owner->lastTab, 1);
    EXPECT_EQ(ui.calls, 1);
    EXPECT_EQ(ui.lastId, kStringTab);
    ASSERT_TRUE(pb->SetValue(kStringTab, 0, L"x", 1));
    EXPECT_EQ(owner->changes, 1) << "setting the same value again is no change";

    // A change inside a referenced map reaches the owner through the block.
    auto* map = new TestMap();
    pb->SetValue(kMap, 0, map);
    const int before = owner->changes;
    map->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
    EXPECT_EQ(owner->changes, before + 1);
    EXPECT_EQ(owner->lastParam, kMap);
    pb->RemoveMap(&ui);
    pb->SetValue(kFloat, 0, 0.1f);
    EXPECT_EQ(ui.lastId, kMap);
}

TEST_F(ParamBlockTest, MapsAreReferencedAndReleased) {
    int live = 0;
    auto* a = new TestMap(&live, 0.2f);
    auto* b = new TestMap(&live, 0.8f);
    ASSERT_TRUE(pb->SetValue(kMap, 0, a));
    EXPECT_EQ(pb->GetReference(pb->ElementRefIndex(kMap, 0)), a);
    EXPECT_EQ(a->GetDependents()[0], pb);
    Texmap* got = nullptr;
    Interval valid = FOREVER;
    ASSERT_TRUE(pb->GetValue(kMap, 0, got, valid));
    EXPECT_EQ(got, a);
    ASSERT_TRUE(pb->SetValue(kMap, 0, b));
    EXPECT_EQ(live, 1) << "the replaced map had no other holder";
    b->DeleteMe();
    EXPECT_EQ(pb->GetTexmap(kMap), nullptr) << "a deleted map leaves an empty slot";
    EXPECT_EQ(live, 0);
}

TEST_F(ParamBlockTest, AccessorsAdjustValuesOnTheWayInAndOut) {
    struct Doubler : PBAccessor {
        void Set(PB2Value& v, ReferenceMaker*, ParamID, int, TimeValue) override {
            v = PB2Value(v.Get<float>() * 2);
        }
        void Get(PB2Value& v, ReferenceMaker* owner, ParamID, int, TimeValue t,
                 Interval& valid) override {
            lastOwner = owner;
            v = PB2Value(v.Get<float>() + 1);
            valid &= Interval(t, t + 10);
        }
        ReferenceMaker* lastOwner = nullptr;
    } doubler;
    ParamBlockDesc2 d(2, L"acc", 0, nullptr, 0, 0, L"V", TYPE_FLOAT, 0, 0, p_accessor, &doubler,
                      p_end, p_end);
    IParamBlock2* block = CreateParameterBlock2(&d, owner);
    ASSERT_TRUE(block->SetValue(0, 0, 3.0f));
    Interval valid = FOREVER;
    float v = 0;
    ASSERT_TRUE(block->GetValue(0, 100, v, valid));
    EXPECT_EQ(v, 7.0f);
    EXPECT_EQ(valid, Interval(100, 110));
    EXPECT_EQ(doubler.lastOwner, owner);
    block->DeleteMe();
}

TEST_F(ParamBlockTest, ResetReturnsToDefaults) {
    CountingMap ui;
    pb->AddMap(&ui);
    auto* map = new TestMap();
    pb->SetValue(kFloat, 0, 0.9f);
    pb->SetValue(kStringTab, 0, L"x", 0);
    pb->SetValue(kMap, 0, map);
    ASSERT_TRUE(pb->Reset(kFloat));
    EXPECT_EQ(pb->GetFloat(kFloat), 0.5f);
    pb->SetValue(kFloat, 0, 0.9f);
    const int calls = ui.calls;
    pb->ResetAll(false, true);
    EXPECT_EQ(ui.calls, calls) << "no UI refresh when not asked";
    EXPECT_EQ(pb->GetFloat(kFloat), 0.5f);
    EXPECT_EQ(pb->GetStr(kStringTab, 0, 0), L"n");
    EXPECT_EQ(pb->GetTexmap(kMap), map) << "maps are not reset";
    pb->ResetAll();
    EXPECT_EQ(ui.calls, calls + 1);
    EXPECT_EQ(ui.lastId, -1);
    pb->RemoveMap(&ui);
}

TEST_F(ParamBlockTest, StoredValuesBypassControllersAccessorsAndUndo) {
    struct Plus : PBAccessor {
        void Get(PB2Value& v, ReferenceMaker*, ParamID, int, TimeValue, Interval&) override {
            v = PB2Value(v.Get<float>() + 100);
        }
    } plus;
    ParamBlockDesc2 d(3, L"stored", 0, nullptr, 0, 0, L"V", TYPE_FLOAT, P_ANIMATABLE, 0, p_accessor,
                      &plus, p_end, 1, L"M", TYPE_TEXMAP, 0, 0, p_end, p_end);
    IParamBlock2* block = CreateParameterBlock2(&d, nullptr);
    theHold.Begin();
    ASSERT_TRUE(block->StoreValue(0, 0, 2));
    theHold.Accept(L"load");
    EXPECT_EQ(theHold.NumUndoSteps(), 0) << "loading is not an undoable change";
    PB2Value v;
    ASSERT_TRUE(block->GetStoredValue(0, 0, v));
    EXPECT_EQ(v.Get<float>(), 2.0f) << "converted to the parameter's storage kind";
    EXPECT_EQ(block->GetFloat(0), 102.0f) << "reads still pass the accessor";

    auto* keys = new LinearFloatControl();
    keys->SetKey(0, 7.0f);
    block->SetController(0, 0, keys);
    ASSERT_TRUE(block->GetStoredValue(0, 0, v));
    EXPECT_EQ(v.Get<float>(), 2.0f) << "the controller does not change the stored value";

    ErrorCapture capture;
    EXPECT_FALSE(block->StoreValue(0, 0, L"text"));
    EXPECT_FALSE(block->StoreValue(1, 0, static_cast<ReferenceTarget*>(nullptr)));
    EXPECT_FALSE(block->GetStoredValue(0, 4, v));
    EXPECT_EQ(capture.errors.size(), 3u);
    block->DeleteMe();
}
