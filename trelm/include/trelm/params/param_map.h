// The hook through which a parameter block keeps its user interface current.
#pragma once

#include <trelm/params/param_types.h>

namespace TrelmSDK {

// A panel showing a block's parameters. The block calls Invalidate when values change; the panel
// re-reads them (on the main thread, where blocks are edited).
class IParamMap2 {
public:
    virtual ~IParamMap2() = default;
    // id -1: every parameter; tabIndex -1: every element.
    virtual void Invalidate(ParamID id = -1, int tabIndex = -1) = 0;
};

} // namespace TrelmSDK

using TrelmSDK::IParamMap2;
