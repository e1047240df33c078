// Interfaces the map publishes, declared with the operations the map object itself answers so
// far; the file-name inputs, outputs and viewport add theirs.
#pragma once

#include <trelm/core/core_interface.h>
#include <trelm/core/mstr.h>

namespace TrelmSDK {
class IParamBlock2;
}

// The map's own interface for its file-name inputs.
class IOSLTex {
public:
    virtual ~IOSLTex() = default;
};

namespace TrelmSDK::OSL {

inline constexpr Interface_ID TESSEL_MAP_INTERFACE_ID(0x5AA01B92, 0x4FA32EFF);

// The scripting interface every Tessel Map publishes.
class ITesselMapInterface : public FPInterface {
public:
    Interface_ID GetID() const override { return TESSEL_MAP_INTERFACE_ID; }
    // The shader's declared name, as recorded for the current code.
    virtual MSTR GetShaderName() const = 0;
    // The map's "OSLCode".
    virtual MSTR GetOSL() = 0;
    // The compiled OSO text recorded for the current key.
    virtual MSTR GetOSO() = 0;
    // The shader parameter block, or none.
    virtual IParamBlock2* GetShaderParamBlock() = 0;
};

} // namespace TrelmSDK::OSL
