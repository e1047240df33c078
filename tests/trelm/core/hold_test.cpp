#include "ref_test_objects.h"

#include <gtest/gtest.h>

using namespace trelm_test;

namespace {
// Every test starts and ends with empty stacks and no open step.
class HoldTest : public ::testing::Test {
protected:
    void SetUp() override { theHold.ClearStacks(); }
    void TearDown() override {
        EXPECT_EQ(theHold.Level(), 0);
        EXPECT_FALSE(theHold.IsSuspended());
        theHold.ClearStacks();
    }
};
} // namespace

TEST_F(HoldTest, AcceptMakesANamedStepThatUndoesAndRedoes) {
    int x = 0;
    EXPECT_FALSE(theHold.Holding());
    theHold.Begin();
    EXPECT_TRUE(theHold.Holding());
    SetUndoable(x, 1);
    SetUndoable(x, 2);
    theHold.Accept(L"Set x");
    EXPECT_FALSE(theHold.Holding());
    ASSERT_EQ(theHold.NumUndoSteps(), 1);
    EXPECT_EQ(theHold.UndoName(), L"Set x");

    EXPECT_TRUE(theHold.Undo());
    EXPECT_EQ(x, 0) << "both records taken back, newest first";
    EXPECT_EQ(theHold.RedoName(), L"Set x");
    EXPECT_TRUE(theHold.Redo());
    EXPECT_EQ(x, 2);
    EXPECT_FALSE(theHold.Redo());
}

TEST_F(HoldTest, ChangesOutsideAStepAreNotRecorded) {
    int x = 0;
    SetUndoable(x, 5);
    theHold.Begin();
    theHold.Accept(L"nothing");
    EXPECT_EQ(theHold.NumUndoSteps(), 0) << "an empty step is not pushed";
    EXPECT_FALSE(theHold.Undo());
    EXPECT_EQ(x, 5);
}

TEST_F(HoldTest, CancelRestoresAndDrops) {
    int x = 1;
    theHold.Begin();
    SetUndoable(x, 2);
    SetUndoable(x, 3);
    theHold.Cancel();
    EXPECT_EQ(x, 1);
    EXPECT_EQ(theHold.NumUndoSteps(), 0);
}

TEST_F(HoldTest, NestedLevelsMergeOrCancelAlone) {
    int x = 0, y = 0;
    theHold.Begin();
    SetUndoable(x, 1);
    theHold.Begin();
    SetUndoable(y, 1);
    theHold.Cancel(); // only the inner change goes
    EXPECT_EQ(y, 0);
    theHold.Begin();
    SetUndoable(y, 2);
    theHold.Accept(L"inner");
    EXPECT_EQ(theHold.NumUndoSteps(), 0) << "an inner accept hands its records outward";
    theHold.Accept(L"outer");
    ASSERT_EQ(theHold.NumUndoSteps(), 1);
    EXPECT_EQ(theHold.UndoName(), L"outer");
    theHold.Undo();
    EXPECT_EQ(x, 0);
    EXPECT_EQ(y, 0);
}

TEST_F(HoldTest, SuspendNestsAndKeepsChangesOut) {
    int x = 0;
    theHold.Begin();
    theHold.Suspend();
    theHold.Suspend();
    EXPECT_TRUE(theHold.IsSuspended());
    SetUndoable(x, 1);
    theHold.Resume();
    EXPECT_FALSE(theHold.Holding()) << "still suspended once";
    SetUndoable(x, 2);
    theHold.Resume();
    EXPECT_TRUE(theHold.Holding());
    SetUndoable(x, 3);
    theHold.Accept(L"step");
    theHold.Undo();
    EXPECT_EQ(x, 2) << "only the change made while not suspended is undone";
}

TEST_F(HoldTest, RestoringFlagsAreVisibleToRecords) {
    struct Probe : RestoreObj {
        bool sawRestoring = false, sawRedoing = false, holdingDuring = true;
        void Restore(bool) override {
            sawRestoring = theHold.Restoring() && theHold.RestoreOrRedoing();
            holdingDuring = theHold.Holding();
        }
        void Redo() override { sawRedoing = theHold.Redoing() && theHold.RestoreOrRedoing(); }
    };
    auto* probe = new Probe;
    theHold.Begin();
    theHold.Put(probe);
    theHold.Accept(L"probe");
    EXPECT_FALSE(theHold.RestoreOrRedoing());
    theHold.Undo();
    EXPECT_TRUE(probe->sawRestoring);
    EXPECT_FALSE(probe->holdingDuring) << "nothing is recorded while undoing";
    theHold.Redo();
    EXPECT_TRUE(probe->sawRedoing);
    EXPECT_FALSE(theHold.RestoreOrRedoing());
}

TEST_F(HoldTest, NewStepEmptiesRedoAndStackIsBounded) {
    int x = 0;
    theHold.SetMaxSteps(3);
    for (int i = 1; i <= 5; ++i) {
        theHold.Begin();
        SetUndoable(x, i);
        theHold.Accept(L"step " + std::to_wstring(i));
    }
    EXPECT_EQ(theHold.NumUndoSteps(), 3);
    theHold.Undo();
    EXPECT_EQ(theHold.NumRedoSteps(), 1);
    theHold.Begin();
    SetUndoable(x, 9);
    theHold.Accept(L"new");
    EXPECT_EQ(theHold.NumRedoSteps(), 0);
    while (theHold.Undo()) {
    }
    EXPECT_EQ(x, 2) << "steps 1 and 2 fell off the bottom";
    theHold.SetMaxSteps(100);
}

TEST_F(HoldTest, UndoWhileAStepIsOpenIsRefused) {
    int x = 0;
    theHold.Begin();
    SetUndoable(x, 1);
    theHold.Accept(L"one");
    theHold.Begin();
    EXPECT_FALSE(theHold.Undo());
    theHold.Accept(L"empty");
    EXPECT_TRUE(theHold.Undo());
}

TEST_F(HoldTest, ReferenceReplacementUndoesAndRedoes) {
    int live = 0;
    auto* owner = new Node(1, &live);
    auto* a = new Node(0, &live);
    auto* b = new Node(0, &live);
    owner->ReplaceReference(0, a);
    theHold.Begin();
    owner->ReplaceReference(0, b);
    theHold.Accept(L"swap");
    EXPECT_EQ(live, 3) << "a is released but the undo record keeps it";
    EXPECT_TRUE(a->GetDependents().empty());

    theHold.Undo();
    EXPECT_EQ(owner->GetReference(0), a);
    EXPECT_EQ(a->GetDependents().size(), 1u);
    EXPECT_TRUE(b->GetDependents().empty());
    theHold.Redo();
    EXPECT_EQ(owner->GetReference(0), b);

    theHold.ClearStacks();
    EXPECT_EQ(live, 2) << "once no record can bring a back, it goes";
    owner->DeleteMe();
    EXPECT_EQ(live, 0);
}

TEST_F(HoldTest, DeletingAnObjectDropsItsRecords) {
    auto* owner = new Node(1);
    auto* a = new Node(0);
    theHold.Begin();
    owner->ReplaceReference(0, a);
    theHold.Accept(L"link");
    ASSERT_EQ(theHold.NumUndoSteps(), 1);
    owner->DeleteMe();
    EXPECT_EQ(theHold.NumUndoSteps(), 0) << "no step may restore into a deleted object";
}
