// Reference slots and their undo records: the maker's side of the reference system.
#include <trelm/core/hold.h>
#include <trelm/core/reference_target.h>
#include <trelm/core/sdk_errors.h>

#include <algorithm>
#include <string>

namespace TrelmSDK {

// Undo record of one slot change. It keeps both targets (and the maker, when it is a target)
// alive so that either state can be put back.
class RefRestore : public RestoreObj {
public:
    RefRestore(ReferenceMaker* maker, int which, ReferenceTarget* before, ReferenceTarget* after)
        : maker_(maker), which_(which), before_(before), after_(after),
          makerTarget_(dynamic_cast<ReferenceTarget*>(maker)) {
        for (auto* t : {makerTarget_, before_, after_})
            if (t) t->HoldLock();
    }
    ~RefRestore() override {
        for (auto* t : {after_, before_, makerTarget_})
            if (t) t->HoldUnlock();
    }
    void Restore(bool) override { maker_->SetSlotUnrecorded(which_, before_); }
    void Redo() override { maker_->SetSlotUnrecorded(which_, after_); }
    MSTR Description() const override { return L"Reference change"; }
    bool RefersTo(const void* object) const override {
        return object == maker_ || object == before_ || object == after_;
    }

private:
    ReferenceMaker* maker_;
    int which_;
    ReferenceTarget* before_;
    ReferenceTarget* after_;
    ReferenceTarget* makerTarget_;
};

ReferenceMaker::~ReferenceMaker() {
    theHold.Purge(this);
    auto targets = std::move(targets_);
    targets_.clear();
    for (auto* t : targets) t->RemoveDependent(this, true);
}

void ReferenceMaker::LinkTarget(RefTargetHandle target) {
    target->AddDependent(this);
    targets_.push_back(target);
    target->RefAdded(this);
}

void ReferenceMaker::UnlinkTarget(RefTargetHandle target) {
    auto it = std::find(targets_.begin(), targets_.end(), target);
    if (it == targets_.end()) return;
    targets_.erase(it);
    target->RemoveDependent(this, true);
}

RefResult ReferenceMaker::ReplaceReference(int which, RefTargetHandle target) {
    const int n = NumRefs();
    if (which < 0 || which >= n) {
        ReportSDKError(L"ReplaceReference: slot " + std::to_wstring(which) + L" is out of range (" +
                       std::to_wstring(n) + L" slots)");
        return REF_FAIL;
    }
    RefTargetHandle old = GetReference(which);
    if (old == target) return REF_SUCCEED;
    if (target && !HoldsWeakReferences() &&
        (static_cast<ReferenceMaker*>(target) == this || target->DependsOn(this))) {
        ReportSDKError(L"ReplaceReference: the target already depends on this object (a "
                       L"reference loop)");
        return REF_FAIL;
    }
    if (target) LinkTarget(target);
    SetReference(which, target);
    if (GetReference(which) != target) {
        // The maker refused the target: undo the link without letting the target delete itself.
        if (target) {
            targets_.erase(std::find(targets_.begin(), targets_.end(), target));
            target->RemoveDependent(this, false);
        }
        ReportSDKError(L"ReplaceReference: slot " + std::to_wstring(which) +
                       L" does not accept this target");
        return REF_FAIL;
    }
    if (!HoldsWeakReferences() && theHold.Holding())
        theHold.Put(new RefRestore(this, which, old, target));
    if (old) UnlinkTarget(old);
    return REF_SUCCEED;
}

RefResult ReferenceMaker::DeleteReference(int which) {
    return ReplaceReference(which, nullptr);
}

RefResult ReferenceMaker::DeleteAllRefsFromMe() {
    RefResult result = REF_SUCCEED;
    for (int i = 0; i < NumRefs(); ++i)
        if (GetReference(i) && ReplaceReference(i, nullptr) != REF_SUCCEED) result = REF_FAIL;
    return result;
}

int ReferenceMaker::FindRef(RefTargetHandle target) {
    for (int i = 0; i < NumRefs(); ++i)
        if (GetReference(i) == target) return i;
    return -1;
}

void ReferenceMaker::SetSlotUnrecorded(int which, RefTargetHandle target) {
    if (which < 0 || which >= NumRefs()) return;
    RefTargetHandle old = GetReference(which);
    if (old == target) return;
    if (target) LinkTarget(target);
    SetReference(which, target);
    if (old) UnlinkTarget(old);
    // Whoever depends on this object sees the restored slot as a change of it.
    if (auto* self = dynamic_cast<ReferenceTarget*>(this); self && !self->IsDeleted())
        self->NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
}

} // namespace TrelmSDK
