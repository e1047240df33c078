// The target's side of the reference system: dependents, change messages, deletion.
#include <trelm/core/hold.h>
#include <trelm/core/reference_target.h>
#include <trelm/core/sdk_errors.h>

#include <algorithm>
#include <unordered_set>

namespace TrelmSDK {

namespace {
bool Reaches(ReferenceMaker* from, const ReferenceMaker* goal,
             std::unordered_set<ReferenceMaker*>& seen) {
    if (!seen.insert(from).second) return false;
    for (int i = 0; i < from->NumRefs(); ++i) {
        ReferenceTarget* t = from->GetReference(i);
        if (!t) continue;
        if (t == goal || Reaches(t, goal, seen)) return true;
    }
    return false;
}
} // namespace

ReferenceTarget::~ReferenceTarget() {
    destroying_ = true;
    if (!deleted_) NotifyDependents(FOREVER, PART_ALL, REFMSG_TARGET_DELETED, NOTIFY_ALL, false);
    DetachFromDependents();
    theHold.Purge(this);
}

RefResult ReferenceTarget::NotifyDependents(const Interval& changeInt, PartID partID,
                                            RefMessage message, SClass_ID sclass, bool propagate,
                                            RefTargetHandle hTarg) {
    auto registered = [this](ReferenceMaker* m) {
        return std::any_of(dependents_.begin(), dependents_.end(),
                           [m](const Dependent& d) { return d.maker == m; });
    };
    // Dependents may drop their references (or be deleted) while they are told.
    const std::vector<Dependent> deps = dependents_;
    std::vector<ReferenceMaker*> told;
    for (const Dependent& d : deps) {
        if (std::find(told.begin(), told.end(), d.maker) != told.end()) continue;
        told.push_back(d.maker);
        if (!registered(d.maker)) continue;
        if (sclass != NOTIFY_ALL && d.maker->SuperClassID() != sclass) continue;
        PartID part = partID;
        RefResult r =
            d.maker->NotifyRefChanged(changeInt, hTarg ? hTarg : this, part, message, propagate);
        if (!propagate || d.weak || r == REF_STOP || !registered(d.maker)) continue;
        if (auto* t = dynamic_cast<ReferenceTarget*>(d.maker))
            t->NotifyDependents(changeInt, part, message, sclass, propagate);
    }
    return REF_SUCCEED;
}

ReferenceTarget* ReferenceTarget::Clone(RemapDir&) {
    MSTR name;
    GetClassName(name, false);
    ReportSDKError(L"Clone: objects of class '" + name + L"' cannot be cloned");
    return nullptr;
}

void ReferenceTarget::BaseClone(ReferenceTarget*, ReferenceTarget*, RemapDir&) {}

std::vector<ReferenceMaker*> ReferenceTarget::GetDependents() const {
    std::vector<ReferenceMaker*> out;
    out.reserve(dependents_.size());
    for (const Dependent& d : dependents_) out.push_back(d.maker);
    return out;
}

int ReferenceTarget::NumStrongDependents() const {
    return static_cast<int>(std::count_if(dependents_.begin(), dependents_.end(),
                                          [](const Dependent& d) { return !d.weak; }));
}

bool ReferenceTarget::DependsOn(const ReferenceMaker* maker) {
    std::unordered_set<ReferenceMaker*> seen;
    return Reaches(this, maker, seen);
}

void ReferenceTarget::AddDependent(ReferenceMaker* maker) {
    bool weak = maker->HoldsWeakReferences();
    dependents_.push_back({maker, weak});
    if (!weak) autoDeletePending_ = false;
}

void ReferenceTarget::RemoveDependent(ReferenceMaker* maker, bool autoDelete) {
    auto it = std::find_if(dependents_.begin(), dependents_.end(),
                           [maker](const Dependent& d) { return d.maker == maker; });
    if (it == dependents_.end()) return;
    bool weak = it->weak;
    dependents_.erase(it);
    if (destroying_) return;
    RefDeleted(maker);
    if (!weak && autoDelete) MaybeAutoDelete();
}

void ReferenceTarget::DetachFromDependents() {
    while (!dependents_.empty()) {
        ReferenceMaker* m = dependents_.back().maker;
        for (int i = 0; i < m->NumRefs(); ++i)
            if (m->GetReference(i) == this) m->SetReference(i, nullptr);
        std::erase_if(dependents_, [m](const Dependent& d) { return d.maker == m; });
        std::erase(m->targets_, this);
    }
}

void ReferenceTarget::DeleteMe() {
    if (deleted_ || destroying_) return;
    deleted_ = true;
    NotifyDependents(FOREVER, PART_ALL, REFMSG_TARGET_DELETED, NOTIFY_ALL, false);
    DetachFromDependents();
    for (int i = 0; i < NumRefs(); ++i)
        if (GetReference(i)) SetSlotUnrecorded(i, nullptr);
    while (!targets_.empty()) UnlinkTarget(targets_.back());
    // Records that could restore this object would restore a deleted one: drop them.
    theHold.Purge(this);
    if (holdLocks_ > 0) {
        deletePending_ = true;
        return;
    }
    DeleteThis();
}

void ReferenceTarget::MaybeAutoDelete() {
    if (deleted_ || destroying_ || NumStrongDependents() > 0) return;
    if (holdLocks_ > 0) {
        autoDeletePending_ = true;
        return;
    }
    DeleteMe();
}

void ReferenceTarget::HoldUnlock() {
    if (holdLocks_ > 0) --holdLocks_;
    if (holdLocks_ > 0 || destroying_) return;
    if (deletePending_) {
        deletePending_ = false;
        DeleteThis();
        return;
    }
    if (autoDeletePending_) {
        autoDeletePending_ = false;
        if (!deleted_ && NumStrongDependents() == 0) DeleteMe();
    }
}

} // namespace TrelmSDK
