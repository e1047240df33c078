#include "params_test_objects.h"

#include <trelm/params/expression_control.h>
#include <trelm/params/keyframe_control.h>

#include <gtest/gtest.h>

#include <memory>

using namespace trelm_test;

namespace {
class ParamUndoTest : public EveryTypeBlockTest {
protected:
    void TearDown() override {
        EXPECT_EQ(theHold.Level(), 0);
        EveryTypeBlockTest::TearDown();
    }
};
} // namespace

TEST_F(ParamUndoTest, SetsOfEveryKindUndoAndRedoAsOneStep) {
    theHold.Begin();
    pb->SetValue(kFloat, 0, 0.9f);
    pb->SetValue(kString, 0, L"new code");
    pb->SetValue(kColor, 0, AColor(1, 1, 0, 1));
    pb->SetValue(kMatrix, 0, Matrix3());
    pb->SetValue(kIntTab, 0, 99, 1);
    theHold.Accept(L"Edit shader");
    ASSERT_EQ(theHold.NumUndoSteps(), 1);

    const int changes = owner->changes;
    ASSERT_TRUE(theHold.Undo());
    EXPECT_EQ(pb->GetFloat(kFloat), 0.5f);
    EXPECT_EQ(pb->GetStr(kString), L"hello");
    EXPECT_EQ(pb->GetAColor(kColor), AColor(0.5f, 0.25f, 0.125f, 1));
    EXPECT_EQ(pb->GetMatrix3(kMatrix), TestMatrix());
    EXPECT_EQ(pb->GetInt(kIntTab, 0, 1), 7);
    EXPECT_EQ(owner->changes, changes + 5) << "the owner hears each restored value";

    ASSERT_TRUE(theHold.Redo());
    EXPECT_EQ(pb->GetFloat(kFloat), 0.9f);
    EXPECT_EQ(pb->GetStr(kString), L"new code");
    EXPECT_EQ(pb->GetInt(kIntTab, 0, 1), 99);
}

TEST_F(ParamUndoTest, CancelAndSuspend) {
    theHold.Begin();
    pb->SetValue(kFloat, 0, 0.9f);
    theHold.Cancel();
    EXPECT_EQ(pb->GetFloat(kFloat), 0.5f);

    theHold.Begin();
    pb->SetValue(kInt, 0, 1);
    theHold.Suspend();
    pb->SetValue(kInt, 0, 2);
    pb->SetValue(kString, 0, L"suspended");
    pb->SetCount(kFloatTab, 10);
    theHold.Resume();
    theHold.Accept(L"step");
    theHold.Undo();
    EXPECT_EQ(pb->GetInt(kInt), 3) << "the recorded set goes back to the value before it";
    EXPECT_EQ(pb->GetStr(kString), L"suspended");
    EXPECT_EQ(pb->Count(kFloatTab), 10);
    EXPECT_EQ(theHold.NumRedoSteps(), 1);

    theHold.ClearStacks();
    theHold.Begin();
    theHold.Suspend();
    pb->SetValue(kFloat, 0, 0.1f);
    theHold.Resume();
    theHold.Accept(L"nothing recorded");
    EXPECT_EQ(theHold.NumUndoSteps(), 0);
}

TEST_F(ParamUndoTest, MapReplacementUndoesAndKeepsTheOldMapAlive) {
    int live = 0;
    auto* a = new TestMap(&live, 0.1f);
    auto* b = new TestMap(&live, 0.9f);
    pb->SetValue(kMap, 0, a);
    theHold.Begin();
    pb->SetValue(kMap, 0, b);
    theHold.Accept(L"Connect map");
    EXPECT_EQ(live, 2) << "the record still needs a";
    EXPECT_EQ(a->NumStrongDependents(), 0);

    theHold.Undo();
    EXPECT_EQ(pb->GetTexmap(kMap), a);
    EXPECT_EQ(a->NumStrongDependents(), 1);
    EXPECT_EQ(b->NumStrongDependents(), 0);
    EXPECT_EQ(owner->lastParam, kMap) << "the owner learns which parameter came back";
    theHold.Redo();
    EXPECT_EQ(pb->GetTexmap(kMap), b);
    theHold.ClearStacks();
    EXPECT_EQ(live, 1) << "nothing can bring a back any more";
    pb->SetValue(kMap, 0, static_cast<ReferenceTarget*>(nullptr));
    EXPECT_EQ(live, 0);
}

TEST_F(ParamUndoTest, TableResizeUndoesValuesAndMaps) {
    int live = 0;
    auto* map = new TestMap(&live);
    pb->SetValue(kMapTab, 0, map, 1);
    pb->SetValue(kFloatTab, 0, 4.0f, 2);
    theHold.Begin();
    pb->SetCount(kMapTab, 0);
    pb->SetCount(kFloatTab, 1);
    pb->SetValue(kFloatTab, 0, 8.0f, 0);
    theHold.Accept(L"Shrink");
    EXPECT_EQ(live, 1);
    theHold.Undo();
    EXPECT_EQ(pb->Count(kMapTab), 2);
    EXPECT_EQ(pb->GetTexmap(kMapTab, 0, 1), map);
    EXPECT_EQ(map->NumStrongDependents(), 1);
    EXPECT_EQ(pb->Count(kFloatTab), 3);
    EXPECT_EQ(pb->GetFloat(kFloatTab, 0, 0), 1.0f);
    EXPECT_EQ(pb->GetFloat(kFloatTab, 0, 2), 4.0f);
    theHold.Redo();
    EXPECT_EQ(pb->Count(kMapTab), 0);
    EXPECT_EQ(pb->Count(kFloatTab), 1);
    EXPECT_EQ(pb->GetFloat(kFloatTab, 0, 0), 8.0f);
    theHold.ClearStacks();
    EXPECT_EQ(live, 0);
}

TEST_F(ParamUndoTest, ControllerAssignmentKeysAndExpressionsUndo) {
    auto* c = new LinearFloatControl();
    c->SetKey(0, 0.0f);
    c->SetKey(100, 1.0f);
    theHold.Begin();
    pb->SetController(kFloat, 0, c);
    theHold.Accept(L"Animate");
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 50), 0.5f);
    theHold.Undo();
    EXPECT_EQ(pb->GetController(kFloat), nullptr);
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 50), 0.5f) << "the stored value again";
    theHold.Redo();
    EXPECT_EQ(pb->GetController(kFloat), c);

    theHold.Begin();
    pb->SetValue(kFloat, 100, 3.0f); // a key change through the block
    theHold.Accept(L"Key");
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 100), 3.0f);
    theHold.Undo();
    EXPECT_FLOAT_EQ(pb->GetFloat(kFloat, 100), 1.0f);

    auto* e = new ExprFloatControl();
    e->SetExpression(L"F");
    pb->SetController(kInt, 0, e);
    theHold.Begin();
    e->SetExpression(L"F * 2");
    theHold.Accept(L"Expression");
    EXPECT_EQ(pb->GetInt(kInt, 1600), 20);
    theHold.Undo();
    EXPECT_EQ(pb->GetInt(kInt, 1600), 10);
    EXPECT_EQ(e->GetExpression(), L"F");
    theHold.Redo();
    EXPECT_EQ(pb->GetInt(kInt, 1600), 20);
}

TEST_F(ParamUndoTest, ReplacingAWholeBlockUndoes) {
    // A block in an owner's slot replaced by a rebuilt one, as a map does when its shader changes.
    IParamBlock2* rebuilt = CreateParameterBlock2(desc.get(), owner);
    rebuilt->SetValue(kFloat, 0, 0.75f);
    theHold.Begin();
    owner->ReplaceReference(1, rebuilt);
    theHold.Accept(L"Rebuild");
    EXPECT_EQ(owner->Block(1)->GetFloat(kFloat), 0.75f);
    theHold.Undo();
    EXPECT_EQ(owner->Block(1), pb);
    EXPECT_EQ(pb->GetFloat(kFloat), 0.5f);
    theHold.Redo();
    EXPECT_EQ(owner->Block(1), rebuilt);
    theHold.ClearStacks(); // pb goes now
}
