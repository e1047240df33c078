// Codes exchanged along references: results of reference calls, change messages and part masks.
#pragma once

#include <cstdint>

namespace TrelmSDK {

// The answer of a reference call or of a dependent to a change message.
enum RefResult : int {
    REF_FAIL = 0,     // the call did nothing (bad slot, a reference loop, ...)
    REF_SUCCEED = 1,  // done; a change message goes on to this dependent's own dependents
    REF_DONTCARE = 2, // the message was of no interest; it still propagates
    REF_STOP = 3,     // the message stops at this dependent
    REF_INVALID = 4,  // the call is not valid in this state
};

// A change message code. The host's codes are plain numbers and pass through unchanged; the SDK
// itself sends and interprets only the named ones.
using RefMessage = uint32_t;

inline constexpr RefMessage REFMSG_TARGET_DELETED = 0x20; // the target is being deleted
inline constexpr RefMessage REFMSG_CHANGE = 0x50;         // the target's value changed
inline constexpr RefMessage REFMSG_REF_DELETED = 0x102;   // a dependent dropped its reference
inline constexpr RefMessage REFMSG_REF_ADDED = 0x103;     // a dependent added a reference
inline constexpr RefMessage REFMSG_SUBANIM_STRUCTURE_CHANGED = 0x10F;
// Codes from here up are free for plug-ins.
inline constexpr RefMessage REFMSG_USER = 0x10000000;

// Which parts of a target a change message is about: a bit mask.
using PartID = uint32_t;

inline constexpr PartID PART_TOPO = 0x1;
inline constexpr PartID PART_GEOM = 0x2;
inline constexpr PartID PART_TEXMAP = 0x4;
inline constexpr PartID PART_MTL = 0x8;
inline constexpr PartID PART_DISPLAY = 0x10;
inline constexpr PartID PART_TM = 0x20;
inline constexpr PartID PART_ALL = 0xFFFFFFFF;

} // namespace TrelmSDK

using TrelmSDK::PartID;
using TrelmSDK::RefMessage;
using TrelmSDK::RefResult;
