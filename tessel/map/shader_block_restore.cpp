// Undo and redo of a shader block replacement.
#include "map/shader_block_restore.h"

#include "map/osl_tex.h"

ShaderBlockRestore::ShaderBlockRestore(OSLTex& map) : map_(&map), before_(Capture(map)) {
    map_->HoldLock();
    if (before_.block) before_.block->HoldLock();
}

ShaderBlockRestore::~ShaderBlockRestore() {
    if (after_.block) after_.block->HoldUnlock();
    if (before_.block) before_.block->HoldUnlock();
    map_->HoldUnlock();
}

void ShaderBlockRestore::CaptureAfter(OSLTex& map) {
    if (after_.block) after_.block->HoldUnlock();
    after_ = Capture(map);
    if (after_.block) after_.block->HoldLock();
}

ShaderBlockRestore::State ShaderBlockRestore::Capture(OSLTex& map) {
    return State{map.shaderBlock_, map.currentDesc_, map.currentInfo_, map.shaderName_,
                 map.outputNames_};
}

void ShaderBlockRestore::Restore(bool) {
    Apply(before_);
}

void ShaderBlockRestore::Redo() {
    Apply(after_);
}

void ShaderBlockRestore::Apply(const State& state) {
    theHold.Suspend();
    map_->ReplaceReference(2, state.block);
    theHold.Resume();
    map_->currentDesc_ = state.desc;
    map_->currentInfo_ = state.info;
    map_->shaderName_ = state.shaderName;
    map_->outputNames_ = state.outputNames;
    map_->ivalid_.SetEmpty();
}

bool ShaderBlockRestore::RefersTo(const void* object) const {
    return object == map_ || object == before_.block || object == after_.block;
}
