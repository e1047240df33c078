#include "ref_test_objects.h"

#include <trelm/core/sdk_errors.h>

#include <gtest/gtest.h>

using namespace trelm_test;

namespace {
// Collects SDK error reports for the duration of a test.
struct ErrorCapture {
    std::vector<MSTR> errors;
    SDKErrorHandler previous;
    ErrorCapture() {
        previous = SetSDKErrorHandler([this](const MSTR& e) { errors.push_back(e); });
    }
    ~ErrorCapture() { SetSDKErrorHandler(previous); }
};
} // namespace

TEST(References, ReplaceReferenceLinksBothWays) {
    int live = 0;
    auto* owner = new Node(2, &live);
    auto* a = new Node(0, &live);
    ASSERT_EQ(owner->ReplaceReference(0, a), REF_SUCCEED);
    EXPECT_EQ(owner->GetReference(0), a);
    ASSERT_EQ(a->GetDependents().size(), 1u);
    EXPECT_EQ(a->GetDependents()[0], owner);
    EXPECT_EQ(owner->FindRef(a), 0);
    // The same target in a second slot counts twice; dropping one keeps it alive.
    owner->ReplaceReference(1, a);
    EXPECT_EQ(a->NumStrongDependents(), 2);
    owner->DeleteReference(0);
    EXPECT_EQ(live, 2);
    EXPECT_EQ(a->NumStrongDependents(), 1);
    owner->DeleteMe();
    EXPECT_EQ(live, 0) << "deleting the owner releases its last reference to a";
}

TEST(References, BadSlotsAndLoopsAreRefused) {
    ErrorCapture capture;
    auto* a = new Node(1);
    auto* b = new Node(1);
    EXPECT_EQ(a->ReplaceReference(5, b), REF_FAIL);
    EXPECT_EQ(a->ReplaceReference(-1, b), REF_FAIL);
    ASSERT_EQ(a->ReplaceReference(0, b), REF_SUCCEED);
    EXPECT_EQ(b->ReplaceReference(0, a), REF_FAIL) << "b -> a -> b would be a loop";
    EXPECT_EQ(b->GetReference(0), nullptr);
    EXPECT_EQ(a->ReplaceReference(0, a), REF_FAIL);
    EXPECT_EQ(a->GetReference(0), b) << "a refused change leaves the slot as it was";
    EXPECT_EQ(capture.errors.size(), 4u);
    a->DeleteMe();
}

TEST(References, RefusedTargetIsNotDeleted) {
    ErrorCapture capture;
    int live = 0;
    auto* owner = new PickyNode();
    auto* t = new Node(0, &live);
    EXPECT_EQ(owner->ReplaceReference(1, t), REF_FAIL);
    EXPECT_EQ(live, 1);
    EXPECT_TRUE(t->GetDependents().empty());
    t->DeleteMe();
    owner->DeleteMe();
}

TEST(References, ChangeMessagesPropagateWithPartsAndCodes) {
    auto* leaf = new Node(0);
    auto* mid = new Node(1);
    auto* top = new Node(1);
    mid->ReplaceReference(0, leaf);
    top->ReplaceReference(0, mid);
    leaf->NotifyDependents(FOREVER, PART_TEXMAP, 629);
    ASSERT_EQ(mid->heard.size(), 1u);
    EXPECT_EQ(mid->heard[0].target, leaf);
    EXPECT_EQ(mid->heard[0].part, PART_TEXMAP);
    EXPECT_EQ(mid->heard[0].message, 629u);
    ASSERT_EQ(top->heard.size(), 1u);
    EXPECT_EQ(top->heard[0].target, mid) << "each level hears from its own target";

    // A dependent may narrow the parts for the next level, or stop the message.
    mid->narrowTo = PART_GEOM;
    leaf->NotifyDependents(FOREVER, PART_GEOM | PART_TEXMAP, REFMSG_CHANGE);
    EXPECT_EQ(top->heard.back().part, PART_GEOM);
    mid->answer = REF_STOP;
    leaf->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
    EXPECT_EQ(top->heard.size(), 2u);
    EXPECT_EQ(mid->heard.size(), 3u);

    // Without propagation only direct dependents hear.
    mid->answer = REF_SUCCEED;
    leaf->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE, NOTIFY_ALL, false);
    EXPECT_EQ(mid->heard.size(), 4u);
    EXPECT_EQ(top->heard.size(), 2u);

    // A super class filter skips dependents of other families.
    leaf->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE, TEXMAP_CLASS_ID);
    EXPECT_EQ(mid->heard.size(), 4u);
    top->DeleteMe();
}

TEST(References, DependentDroppingItsReferenceDuringANotification) {
    struct Dropper : Node {
        RefResult NotifyRefChanged(const Interval& i, RefTargetHandle h, PartID& p, RefMessage m,
                                   bool pr) override {
            Node::NotifyRefChanged(i, h, p, m, pr);
            DeleteReference(0);
            return REF_SUCCEED;
        }
    };
    auto* target = new Node(0);
    auto* keeper = new Node(1);
    auto* dropper = new Dropper();
    keeper->ReplaceReference(0, target);
    dropper->ReplaceReference(0, target);
    target->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
    EXPECT_EQ(dropper->GetReference(0), nullptr);
    EXPECT_EQ(keeper->heard.size(), 1u);
    target->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
    EXPECT_EQ(dropper->heard.size(), 1u) << "a dropped dependent hears nothing more";
    dropper->DeleteMe();
    keeper->DeleteMe();
}

TEST(References, LastReleaseDeletesTheTarget) {
    int live = 0;
    auto* owner = new Node(1, &live);
    auto* a = new Node(0, &live);
    auto* b = new Node(0, &live);
    owner->ReplaceReference(0, a);
    owner->ReplaceReference(0, b);
    EXPECT_EQ(live, 2) << "a lost its only dependent";
    owner->DeleteMe();
    EXPECT_EQ(live, 0);
}

TEST(WeakReferences, DoNotKeepAliveAndClearOnDelete) {
    int live = 0;
    auto* owner = new Node(1, &live);
    auto* map = new Node(0, &live);
    owner->ReplaceReference(0, map);
    WeakRef<Node> weak(map);
    EXPECT_EQ(weak.Get(), map);
    EXPECT_EQ(map->NumStrongDependents(), 1);
    EXPECT_EQ(map->GetDependents().size(), 2u);

    struct Watcher : SingleWeakRefMaker {
        int deletedMessages = 0;
        RefResult NotifyRefChanged(const Interval&, RefTargetHandle, PartID&, RefMessage m,
                                   bool) override {
            if (m == REFMSG_TARGET_DELETED) ++deletedMessages;
            return REF_SUCCEED;
        }
    } watcher;
    watcher.SetRef(map);

    owner->DeleteReference(0); // the weak references do not keep map alive
    EXPECT_EQ(live, 1);
    EXPECT_EQ(weak.Get(), nullptr);
    EXPECT_FALSE(weak);
    EXPECT_EQ(watcher.GetRef(), nullptr);
    EXPECT_EQ(watcher.deletedMessages, 1);
    owner->DeleteMe();
    EXPECT_EQ(live, 0);
}

TEST(WeakReferences, ExplicitDeleteClearsStrongAndWeakHolders) {
    int live = 0;
    auto* owner = new Node(1, &live);
    auto* map = new Node(0, &live);
    owner->ReplaceReference(0, map);
    SingleWeakRefMaker weak(map);
    SingleWeakRefMaker copy = weak;
    map->DeleteMe();
    EXPECT_EQ(live, 1);
    EXPECT_EQ(owner->GetReference(0), nullptr);
    EXPECT_EQ(weak.GetRef(), nullptr);
    EXPECT_EQ(copy.GetRef(), nullptr);
    ASSERT_FALSE(owner->heard.empty());
    EXPECT_EQ(owner->heard.back().message, REFMSG_TARGET_DELETED);
    owner->DeleteMe();
}

TEST(WeakReferences, HolderGoingAwayFirstUnregisters) {
    auto* map = new Node(0);
    {
        WeakRef<Node> weak(map);
        EXPECT_EQ(map->GetDependents().size(), 1u);
    }
    EXPECT_TRUE(map->GetDependents().empty());
    map->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE); // must not touch the gone holder
    map->DeleteMe();
}

TEST(Clone, SharedTargetsStaySharedAndPostPatchRuns) {
    int live = 0;
    auto* root = new Node(2, &live);
    auto* shared = new Node(0, &live);
    shared->tag = 7;
    root->ReplaceReference(0, shared);
    root->ReplaceReference(1, shared);

    RemapDir remap;
    int patched = 0;
    remap.AddPostPatchProc([&](RemapDir& r) {
        EXPECT_NE(r.FindMapping(shared), nullptr);
        ++patched;
    });
    auto* copy = static_cast<Node*>(remap.CloneRef(root));
    remap.Backpatch();
    ASSERT_NE(copy, nullptr);
    EXPECT_EQ(patched, 1);
    EXPECT_EQ(live, 4);
    auto* copiedShared = static_cast<Node*>(copy->GetReference(0));
    EXPECT_NE(copiedShared, shared);
    EXPECT_EQ(copiedShared, copy->GetReference(1)) << "cloned once through the remap directory";
    EXPECT_EQ(copiedShared->tag, 7);
    EXPECT_EQ(remap.Remap(shared), copiedShared);
    EXPECT_EQ(remap.CloneRef(root), copy) << "asking again gives the same clone";

    root->DeleteMe();
    EXPECT_EQ(live, 2) << "the copy is independent of the original";
    copy->DeleteMe();
    EXPECT_EQ(live, 0);
}

TEST(Clone, ClassesThatCannotCloneReport) {
    ErrorCapture capture;
    struct Plain : ReferenceTarget {};
    auto* p = new Plain();
    EXPECT_EQ(CloneRefHierarchy(p), nullptr);
    EXPECT_EQ(capture.errors.size(), 1u);
    p->DeleteMe();
}
