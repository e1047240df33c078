// Accessors: code a parameter's owner attaches to compute or check its values and names.
#pragma once

#include <trelm/core/reference_maker.h>
#include <trelm/params/pb2_value.h>

namespace TrelmSDK {

// Attached to parameters with p_accessor; not owned by the descriptor. Called on the thread that
// reads or writes the block.
class PBAccessor {
public:
    virtual ~PBAccessor() = default;
    // After a value is read (from storage or its controller): may replace it and narrow valid.
    virtual void Get(PB2Value& v, ReferenceMaker* owner, ParamID id, int tabIndex, TimeValue t,
                     Interval& valid) {
        (void)v, (void)owner, (void)id, (void)tabIndex, (void)t, (void)valid;
    }
    // Before a value is stored: may change it.
    virtual void Set(PB2Value& v, ReferenceMaker* owner, ParamID id, int tabIndex, TimeValue t) {
        (void)v, (void)owner, (void)id, (void)tabIndex, (void)t;
    }
    // The local name of a parameter flagged P_COMPUTED_NAME; the base answers the empty text.
    virtual MSTR GetLocalName(ReferenceMaker* owner, ParamID id, int tabIndex) {
        (void)owner, (void)id, (void)tabIndex;
        return {};
    }
};

} // namespace TrelmSDK

using TrelmSDK::PBAccessor;
