// Weak references: hold a target without keeping it alive, and clear when it is deleted.
#pragma once

#include <trelm/core/reference_target.h>

namespace TrelmSDK {

// One weak reference. It reads as none once its target is deleted. Copying makes another weak
// reference to the same target. Override NotifyRefChanged to react to the target's messages
// (REFMSG_TARGET_DELETED arrives before the reference clears).
class SingleWeakRefMaker : public ReferenceMaker {
public:
    SingleWeakRefMaker() = default;
    explicit SingleWeakRefMaker(RefTargetHandle target) { SetRef(target); }
    SingleWeakRefMaker(const SingleWeakRefMaker& o) : ReferenceMaker() { SetRef(o.target_); }
    SingleWeakRefMaker& operator=(const SingleWeakRefMaker& o) {
        SetRef(o.target_);
        return *this;
    }
    ~SingleWeakRefMaker() override { SetRef(nullptr); }

    void SetRef(RefTargetHandle target) { ReplaceReference(0, target); }
    RefTargetHandle GetRef() const { return target_; }

    int NumRefs() override { return 1; }
    RefTargetHandle GetReference(int i) override { return i == 0 ? target_ : nullptr; }
    bool HoldsWeakReferences() const override { return true; }
    void DeleteThis() override {} // owned by its holder, never by the reference system

protected:
    void SetReference(int i, RefTargetHandle target) override {
        if (i == 0) target_ = target;
    }

private:
    RefTargetHandle target_ = nullptr;
};

// A typed weak reference.
template <class T>
class WeakRef : public SingleWeakRefMaker {
public:
    WeakRef() = default;
    explicit WeakRef(T* target) : SingleWeakRefMaker(target) {}
    T* Get() const { return static_cast<T*>(GetRef()); }
    T* operator->() const { return Get(); }
    explicit operator bool() const { return GetRef() != nullptr; }
};

} // namespace TrelmSDK

using TrelmSDK::SingleWeakRefMaker;
