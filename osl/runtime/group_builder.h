// Group construction: parameters, layers and connections, with the checks and messages of the
// reference shading system.
#pragma once

#include "shading_system_impl.h"

namespace OSL {

bool addParameter(ShadingSystemImpl& sys, ShaderGroup& g, string_view name, TypeDesc t,
                  const void* val, bool lockgeom);
bool addShader(ShadingSystemImpl& sys, ShaderGroup& g, string_view usage, string_view shadername,
               string_view layername);
bool connectShaders(ShadingSystemImpl& sys, ShaderGroup& g, string_view srclayer,
                    string_view srcparam, string_view dstlayer, string_view dstparam);
bool endGroup(ShadingSystemImpl& sys, ShaderGroup& g);

// The group as text from which an identical group can be rebuilt (group attribute "pickle").
std::string serializeGroup(const ShaderGroup& g);

} // namespace OSL
