// The accessor of "OSLShaderName".
#include "map/pb_shader_accessor.h"

#include "map/osl_tex.h"

void PBShaderAccessor::Get(PB2Value& v, ReferenceMaker* owner, ParamID, int, TimeValue, Interval&) {
    if (auto* map = dynamic_cast<OSLTex*>(owner))
        v = PB2Value(map->GetShaderName());
    else
        v = PB2Value(L"?");
}

PBShaderAccessor& PBShaderAccessor::Instance() {
    static PBShaderAccessor accessor;
    return accessor;
}
