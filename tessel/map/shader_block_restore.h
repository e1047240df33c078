// ShaderBlockRestore: the undo record of a shader block replacement, so that undoing a code change
// brings back the very block (values, controllers, maps) that later undo records refer to.
#pragma once

#include "compile/oso_info.h"

#include <trelm/core/hold.h>
#include <trelm/params/iparam_block2.h>

#include <memory>
#include <vector>

class OSLTex;

class ShaderBlockRestore : public RestoreObj {
public:
    // Captures the map's state before the rebuild.
    explicit ShaderBlockRestore(OSLTex& map);
    ~ShaderBlockRestore() override;
    // Captures the state after the rebuild.
    void CaptureAfter(OSLTex& map);

    void Restore(bool isUndo) override;
    void Redo() override;
    MSTR Description() const override { return L"Shader block change"; }
    bool RefersTo(const void* object) const override;

private:
    struct State {
        IParamBlock2* block = nullptr;
        std::shared_ptr<ParamBlockDesc2> desc;
        std::shared_ptr<const OSOInfo> info;
        MSTR shaderName;
        std::vector<MSTR> outputNames;
    };
    static State Capture(OSLTex& map);
    void Apply(const State& state);

    OSLTex* map_;
    State before_, after_;
};
