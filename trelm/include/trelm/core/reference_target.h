// Objects that can be referenced: dependents, change messages, deletion and cloning.
#pragma once

#include <trelm/core/reference_maker.h>

#include <vector>

namespace TrelmSDK {

// A ReferenceTarget knows the makers that reference it (its dependents) and sends them change
// messages. Deletion rules:
//  - DeleteMe() tells every dependent (REFMSG_TARGET_DELETED), empties their slots that hold this
//    object (weak references thereby clear themselves), drops this object's own references and
//    frees it through DeleteThis().
//  - When the last strong dependent drops its reference the target deletes itself the same way
//    (MaybeAutoDelete). Undo records keep a target alive while they may still restore it.
// Main thread only, like the rest of the reference system.
class ReferenceTarget : public ReferenceMaker {
public:
    ReferenceTarget() = default;
    ~ReferenceTarget() override;

    SClass_ID SuperClassID() const override { return REF_TARGET_CLASS_ID; }

    // Sends message to every dependent (of super class sclass, or all with NOTIFY_ALL). With
    // propagate, a dependent that is itself a target and does not answer REF_STOP passes the
    // message on to its own dependents. hTarg names the changed object (this when none).
    RefResult NotifyDependents(const Interval& changeInt, PartID partID, RefMessage message,
                               SClass_ID sclass = NOTIFY_ALL, bool propagate = true,
                               RefTargetHandle hTarg = nullptr);

    // A copy of this object whose references are the remap directory's clones of this object's
    // targets. Classes that can be cloned override it; the default reports and returns none.
    virtual ReferenceTarget* Clone(RemapDir& remap);
    // Copies what the base classes hold from one clone to the other; call it from Clone.
    void BaseClone(ReferenceTarget* from, ReferenceTarget* to, RemapDir& remap);

    // Makers referencing this object, once per reference (weak ones included).
    std::vector<ReferenceMaker*> GetDependents() const;
    int NumStrongDependents() const;
    bool DependsOn(const ReferenceMaker* maker);

    // Called after a maker added a reference to this object / dropped one.
    virtual void RefAdded(ReferenceMaker* rm) { (void)rm; }
    virtual void RefDeleted(ReferenceMaker* rm) { (void)rm; }

    // Deletes the object now, as described above. Not undoable.
    void DeleteMe();
    // Deletes the object when no strong dependent is left.
    void MaybeAutoDelete();
    // True once DeleteMe has run (while an undo record still keeps the memory).
    bool IsDeleted() const { return deleted_; }

    // Kept alive by undo records: while locked, deletion is deferred until the last unlock.
    void HoldLock() { ++holdLocks_; }
    void HoldUnlock();

private:
    friend class ReferenceMaker;
    struct Dependent {
        ReferenceMaker* maker;
        bool weak;
    };
    void AddDependent(ReferenceMaker* maker);
    // Drops one registration of maker; may delete this object when autoDelete is set.
    void RemoveDependent(ReferenceMaker* maker, bool autoDelete);
    void DetachFromDependents();

    std::vector<Dependent> dependents_;
    int holdLocks_ = 0;
    bool autoDeletePending_ = false; // lost its last strong dependent while locked
    bool deletePending_ = false;     // DeleteMe ran while locked
    bool deleted_ = false;
    bool destroying_ = false;
};

} // namespace TrelmSDK

using TrelmSDK::ReferenceTarget;
