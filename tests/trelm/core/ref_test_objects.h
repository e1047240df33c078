// Small reference-system objects shared by the core tests: a node with slots that logs messages.
#pragma once

#include <trelm/core/hold.h>
#include <trelm/core/remap_dir.h>
#include <trelm/core/weak_reference.h>

#include <vector>

namespace trelm_test {

using namespace TrelmSDK;

// What a node heard: who changed, which parts, which message.
struct Heard {
    ReferenceTarget* target;
    PartID part;
    RefMessage message;
};

// A target with a fixed number of slots. It records every message, counts live nodes, and can
// stop propagation or narrow the part mask for its own dependents.
class Node : public ReferenceTarget {
public:
    explicit Node(int slots = 2, int* live = nullptr) : slots_(slots, nullptr), live_(live) {
        if (live_) ++*live_;
    }
    ~Node() override {
        if (live_) --*live_;
    }
    int NumRefs() override { return static_cast<int>(slots_.size()); }
    RefTargetHandle GetReference(int i) override { return slots_[i]; }
    RefResult NotifyRefChanged(const Interval&, RefTargetHandle hTarget, PartID& part,
                               RefMessage message, bool) override {
        heard.push_back({hTarget, part, message});
        if (narrowTo) part &= narrowTo;
        return answer;
    }
    ReferenceTarget* Clone(RemapDir& remap) override {
        auto* n = new Node(NumRefs(), live_);
        n->tag = tag;
        for (int i = 0; i < NumRefs(); ++i)
            if (slots_[i]) n->ReplaceReference(i, remap.CloneRef(slots_[i]));
        BaseClone(this, n, remap);
        return n;
    }

    std::vector<Heard> heard;
    RefResult answer = REF_SUCCEED;
    PartID narrowTo = 0;
    int tag = 0;

protected:
    void SetReference(int i, RefTargetHandle t) override { slots_[i] = t; }

private:
    std::vector<ReferenceTarget*> slots_;
    int* live_;
};

// A node whose slot 1 refuses every target (like an owner whose spare slot ignores writes).
class PickyNode : public Node {
protected:
    void SetReference(int i, RefTargetHandle t) override {
        if (i != 1) Node::SetReference(i, t);
    }
};

// A custom undo record over an int.
class IntRestore : public RestoreObj {
public:
    IntRestore(int& target, int before, int after) : t_(target), before_(before), after_(after) {}
    void Restore(bool) override { t_ = before_; }
    void Redo() override { t_ = after_; }

private:
    int& t_;
    int before_, after_;
};

// Sets an int undoably, as plug-in code does.
inline void SetUndoable(int& target, int value) {
    if (theHold.Holding()) theHold.Put(new IntRestore(target, target, value));
    target = value;
}

} // namespace trelm_test
