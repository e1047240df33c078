// One cloning operation's map from originals to clones.
#include <trelm/core/remap_dir.h>

namespace TrelmSDK {

ReferenceTarget* RemapDir::CloneRef(ReferenceTarget* from) {
    if (!from) return nullptr;
    if (auto* found = FindMapping(from)) return found;
    ReferenceTarget* to = from->Clone(*this);
    if (to && !FindMapping(from)) AddEntry(from, to);
    return to;
}

ReferenceTarget* RemapDir::FindMapping(ReferenceTarget* from) const {
    auto it = map_.find(from);
    return it == map_.end() ? nullptr : it->second;
}

void RemapDir::AddEntry(ReferenceTarget* from, ReferenceTarget* to) {
    if (from && to) map_[from] = to;
}

ReferenceTarget* RemapDir::Remap(ReferenceTarget* target) const {
    auto* clone = FindMapping(target);
    return clone ? clone : target;
}

void RemapDir::AddPostPatchProc(std::function<void(RemapDir&)> proc) {
    if (proc) procs_.push_back(std::move(proc));
}

void RemapDir::Backpatch() {
    // A proc may add further procs; run until none are left.
    while (!procs_.empty()) {
        auto procs = std::move(procs_);
        procs_.clear();
        for (auto& p : procs) p(*this);
    }
}

ReferenceTarget* CloneRefHierarchy(ReferenceTarget* root) {
    RemapDir remap;
    ReferenceTarget* clone = remap.CloneRef(root);
    remap.Backpatch();
    return clone;
}

} // namespace TrelmSDK
