// Numbers of the parameter block system: parameter types, flags, descriptor tags and UI controls.
#pragma once

#include <cstdint>

namespace TrelmSDK {

using ParamID = short;   // a parameter's ID inside its block
using BlockID = short;   // a block's ID inside its owner
using StringResID = int; // a resource string number (0: none)
using MapID = int;

// Parameter types. A table of a type adds TYPE_TAB.
enum ParamType2 : int {
    TYPE_FLOAT = 0,
    TYPE_INT = 1,
    TYPE_POINT3 = 3,
    TYPE_BOOL = 4,
    TYPE_WORLD = 7, // a float in world units
    TYPE_STRING = 8,
    TYPE_FILENAME = 9,
    TYPE_TEXMAP = 15,
    TYPE_MATRIX3 = 20,
    TYPE_POINT4 = 22,
    TYPE_FRGBA = 23, // colour with alpha
    TYPE_POINT2 = 30,

    TYPE_TAB = 0x800,
    TYPE_FLOAT_TAB = TYPE_FLOAT + TYPE_TAB,
    TYPE_INT_TAB = TYPE_INT + TYPE_TAB,
    TYPE_POINT3_TAB = TYPE_POINT3 + TYPE_TAB,
    TYPE_BOOL_TAB = TYPE_BOOL + TYPE_TAB,
    TYPE_WORLD_TAB = TYPE_WORLD + TYPE_TAB,
    TYPE_STRING_TAB = TYPE_STRING + TYPE_TAB,
    TYPE_FILENAME_TAB = TYPE_FILENAME + TYPE_TAB,
    TYPE_TEXMAP_TAB = TYPE_TEXMAP + TYPE_TAB,
    TYPE_MATRIX3_TAB = TYPE_MATRIX3 + TYPE_TAB,
    TYPE_POINT4_TAB = TYPE_POINT4 + TYPE_TAB,
    TYPE_FRGBA_TAB = TYPE_FRGBA + TYPE_TAB,
    TYPE_POINT2_TAB = TYPE_POINT2 + TYPE_TAB,
};

constexpr bool IsTabType(int type) {
    return (type & TYPE_TAB) != 0;
}
constexpr ParamType2 BaseType(int type) {
    return static_cast<ParamType2>(type & ~TYPE_TAB);
}
// Whether the SDK knows the type (with or without the table bit).
constexpr bool IsKnownType(int type) {
    switch (BaseType(type)) {
    case TYPE_FLOAT:
    case TYPE_INT:
    case TYPE_POINT3:
    case TYPE_BOOL:
    case TYPE_WORLD:
    case TYPE_STRING:
    case TYPE_FILENAME:
    case TYPE_TEXMAP:
    case TYPE_MATRIX3:
    case TYPE_POINT4:
    case TYPE_FRGBA:
    case TYPE_POINT2:
        return (type & ~(TYPE_TAB | 0x7FF)) == 0;
    default:
        return false;
    }
}

// Parameter flags (ParamDef::flags).
enum ParamFlags : int {
    P_ANIMATABLE = 0x1,       // may be driven by a controller
    P_TRANSIENT = 0x2,        // not saved with the block
    P_COMPUTED_NAME = 0x8,    // the local name comes from the accessor's GetLocalName
    P_INVISIBLE = 0x10,       // not shown in automatic user interfaces
    P_SUBANIM = 0x40,         // shown as a sub-animatable of the owner
    P_SUBTEX = 0x800,         // a sub-texture slot (set by p_subtexno)
    P_VARIABLE_SIZE = 0x1000, // the user may resize the table
    P_READ_ONLY = 0x8000,     // not editable through user interfaces and scripts
};

// Descriptor flags (ParamBlockDesc2::Flags).
enum ParamBlockDescFlags : int {
    P_AUTO_CONSTRUCT = 0x2, // the class descriptor creates the block into reference RefNo()
    P_VERSION = 0x400,      // a version number follows the flags in the tagged list
    P_AUTO_UI_QT = 0x4000,  // the block's panel is built by the automatic Qt parameter UI
};

// Tags of the tagged lists that build descriptors. Arguments follow each tag.
enum ParamTag : uint32_t {
    p_default = 0xC0000000,     // value of the parameter's type
    p_range = 0xC0000002,       // low, high (numbers; vectors and colours apply them per component)
    p_ui = 0xC0000003,          // control type; for TYPE_SPINNER also edit type and scale
    p_accessor = 0xC0000005,    // PBAccessor*
    p_subtexno = 0xC0000008,    // sub-texture number; sets P_SUBTEX
    p_assetTypeID = 0xC0000017, // asset type number (1: bitmap)
    p_world_units = 0xC0000019, // no argument: a float shown in world units
    p_end = 0xC0000400,         // ends a parameter, and the descriptor's list
};

// Control types of p_ui.
enum ControlType2 : int {
    TYPE_SPINNER = 0,
    TYPE_RADIO = 1,
    TYPE_SINGLECHECKBOX = 2,
    TYPE_COLORSWATCH = 4,
    TYPE_EDITBOX = 5,
    TYPE_TEXMAPBUTTON = 10,
    TYPE_FILEOPENBUTTON = 12,
    TYPE_INT_COMBOBOX = 23,
};

// Edit types of a TYPE_SPINNER control.
enum EditSpinnerType : int {
    EDITTYPE_FLOAT = 1,
    EDITTYPE_UNIVERSE = 2, // world units
    EDITTYPE_INT = 3,
    EDITTYPE_POS_FLOAT = 4,
    EDITTYPE_POS_INT = 5,
};

} // namespace TrelmSDK

using TrelmSDK::BlockID;
using TrelmSDK::ParamID;
using TrelmSDK::ParamType2;
