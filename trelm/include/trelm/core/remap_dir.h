// Cloning a web of referenced objects so that shared targets stay shared in the copy.
#pragma once

#include <trelm/core/reference_target.h>

#include <functional>
#include <unordered_map>
#include <vector>

namespace TrelmSDK {

// The directory of one cloning operation: from original to clone. A target reached twice is
// cloned once, so the copy shares exactly what the original shared.
class RemapDir {
public:
    // The clone of from in this operation, made on first request through from->Clone(*this).
    // None for none, and when from cannot be cloned.
    ReferenceTarget* CloneRef(ReferenceTarget* from);
    // The clone already made for from, or none.
    ReferenceTarget* FindMapping(ReferenceTarget* from) const;
    // Records to as the clone of from (Clone may call it early so that back-pointers resolve).
    void AddEntry(ReferenceTarget* from, ReferenceTarget* to);
    // The clone of target when it was cloned in this operation, else target itself: for pointers
    // that do not own (weak references) and should follow the copy when it exists.
    ReferenceTarget* Remap(ReferenceTarget* target) const;
    // Work to run once the whole hierarchy is cloned, in the order added.
    void AddPostPatchProc(std::function<void(RemapDir&)> proc);
    // Runs and clears the post-patch work; CloneRefHierarchy calls it.
    void Backpatch();

private:
    std::unordered_map<ReferenceTarget*, ReferenceTarget*> map_;
    std::vector<std::function<void(RemapDir&)>> procs_;
};

// Clones root and everything it references, then back-patches.
ReferenceTarget* CloneRefHierarchy(ReferenceTarget* root);

} // namespace TrelmSDK

using TrelmSDK::CloneRefHierarchy;
using TrelmSDK::RemapDir;
