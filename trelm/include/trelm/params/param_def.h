// The description of one parameter of a block.
#pragma once

#include <trelm/params/pb2_value.h>
#include <trelm/params/pb_accessor.h>

namespace TrelmSDK {

// What a descriptor knows of one parameter. Built from a tagged list (ParamBlockDesc2::AddParam)
// or filled in directly and added with AddParam(const ParamDef&).
struct ParamDef {
    ParamID ID = -1;
    MSTR int_name;              // internal (script, UI binding) name
    int type = TYPE_FLOAT;      // ParamType2, with TYPE_TAB for tables
    int flags = 0;              // ParamFlags
    StringResID local_name = 0; // resource string of the local name
    int tab_size = 0;           // initial count of a table

    PB2Value def; // default, in the type's storage kind
    bool has_range = false;
    float range_low = 0, range_high = 0;

    int ctrl_type = -1; // p_ui control (ControlType2); -1: none
    int edit_type = 0;  // p_ui edit type of a spinner
    float scale = 0;    // p_ui spinner step

    PBAccessor* accessor = nullptr;
    int sub_texmap = -1;      // p_subtexno
    int asset_type = 0;       // p_assetTypeID; 0: none
    bool world_units = false; // p_world_units

    bool IsTab() const { return IsTabType(type); }
    bool IsAnimatable() const { return (flags & P_ANIMATABLE) != 0; }
};

} // namespace TrelmSDK

using TrelmSDK::ParamDef;
