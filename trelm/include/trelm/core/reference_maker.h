// Objects that hold numbered references to targets and hear about the targets' changes.
#pragma once

#include <trelm/core/animatable.h>
#include <trelm/core/ref_messages.h>
#include <trelm/core/time.h>

#include <vector>

namespace TrelmSDK {

class ReferenceTarget;
class RemapDir;
using RefTargetHandle = ReferenceTarget*;

// A ReferenceMaker keeps NumRefs() numbered slots. It stores and reads them itself
// (GetReference/SetReference) but changes them only through ReplaceReference, which keeps the
// dependency links in both directions and records the change for undo.
//
// Lifetime: a maker that is deleted drops all its references; a target whose last strong
// dependent drops it deletes itself (see ReferenceTarget). All reference calls belong to the main
// thread.
class ReferenceMaker : public Animatable {
public:
    ReferenceMaker() = default;
    ~ReferenceMaker() override;

    SClass_ID SuperClassID() const override { return REF_MAKER_CLASS_ID; }

    virtual int NumRefs() { return 0; }
    virtual RefTargetHandle GetReference(int i) {
        (void)i;
        return nullptr;
    }

    // Puts target into slot which: makes this a dependent of target, stores it through
    // SetReference, and releases the previous target (which deletes itself when nothing else holds
    // it). Recorded for undo while theHold is holding. Fails (REF_FAIL, reported) for a slot out
    // of range, for a target that already depends on this object (a loop), and when SetReference
    // does not keep the target.
    RefResult ReplaceReference(int which, RefTargetHandle target);
    // ReplaceReference(which, nullptr).
    RefResult DeleteReference(int which);
    // Empties every slot.
    RefResult DeleteAllRefsFromMe();
    // The first slot holding target, or -1.
    int FindRef(RefTargetHandle target);

    // A target this object references changed. partID may be narrowed for this object's own
    // dependents. Answer REF_STOP to keep the message from travelling further.
    virtual RefResult NotifyRefChanged(const Interval& changeInt, RefTargetHandle hTarget,
                                       PartID& partID, RefMessage message, bool propagate) {
        (void)changeInt, (void)hTarget, (void)partID, (void)message, (void)propagate;
        return REF_SUCCEED;
    }

    // Weak makers do not keep their targets alive, are not recorded for undo, and do not pass
    // change messages on; they still hear them, and their slots are emptied when a target is
    // deleted.
    virtual bool HoldsWeakReferences() const { return false; }

protected:
    // Stores target in slot i; only ReplaceReference and the reference system call it.
    virtual void SetReference(int i, RefTargetHandle target) { (void)i, (void)target; }

    // Slot changes that bypass undo, for objects that rebuild their slots wholesale (a parameter
    // block resizing a table): link registers this as a dependent of target, unlink drops one such
    // registration and lets the target delete itself when it was the last.
    void LinkTarget(RefTargetHandle target);
    void UnlinkTarget(RefTargetHandle target);

private:
    friend class ReferenceTarget;
    friend class RefRestore;
    // Sets a slot without recording it: the undo record's path.
    void SetSlotUnrecorded(int which, RefTargetHandle target);

    // Every target this object is registered with, once per registration.
    std::vector<ReferenceTarget*> targets_;
};

} // namespace TrelmSDK

using TrelmSDK::ReferenceMaker;
using TrelmSDK::RefTargetHandle;
