// PBShaderAccessor: computes "OSLShaderName" from the map that owns the fixed block.
#pragma once

#include <trelm/params/pb_accessor.h>

class PBShaderAccessor : public PBAccessor {
public:
    // The owning map's shaderName, or "?" when the block's owner is not a map.
    void Get(PB2Value& v, ReferenceMaker* owner, ParamID id, int tabIndex, TimeValue t,
             Interval& valid) override;

    static PBShaderAccessor& Instance();
};
