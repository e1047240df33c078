// Identifiers of classes and interfaces: two 32-bit halves, plus the super class a class belongs
// to.
#pragma once

#include <compare>
#include <cstddef>
#include <cstdint>
#include <functional>

namespace TrelmSDK {

using ULONG = uint32_t;
using DWORD = uint32_t;

// The family a class belongs to (texture map, float controller, ...).
using SClass_ID = ULONG;

// A class identifier: two 32-bit values chosen by the class's author.
class Class_ID {
public:
    constexpr Class_ID() = default;
    constexpr Class_ID(ULONG a, ULONG b) : a_(a), b_(b) {}
    constexpr ULONG PartA() const { return a_; }
    constexpr ULONG PartB() const { return b_; }
    constexpr void SetPartA(ULONG a) { a_ = a; }
    constexpr void SetPartB(ULONG b) { b_ = b; }
    constexpr auto operator<=>(const Class_ID&) const = default;

private:
    ULONG a_ = 0xFFFFFFFF, b_ = 0xFFFFFFFF;
};

// An interface identifier, same shape as a class identifier but a separate key space.
class Interface_ID {
public:
    constexpr Interface_ID() = default;
    constexpr Interface_ID(ULONG a, ULONG b) : a_(a), b_(b) {}
    constexpr ULONG PartA() const { return a_; }
    constexpr ULONG PartB() const { return b_; }
    constexpr auto operator<=>(const Interface_ID&) const = default;

private:
    ULONG a_ = 0, b_ = 0;
};

// Super class IDs of the families the SDK knows.
inline constexpr SClass_ID GEN_DERIVOB_CLASS_ID = 0x0001;
inline constexpr SClass_ID REF_MAKER_CLASS_ID = 0x0100;
inline constexpr SClass_ID REF_TARGET_CLASS_ID = 0x0200;
inline constexpr SClass_ID PARAMETER_BLOCK2_CLASS_ID = 0x0082;
inline constexpr SClass_ID MATERIAL_CLASS_ID = 0x0C00;
inline constexpr SClass_ID TEXMAP_CLASS_ID = 0x0C10;
inline constexpr SClass_ID RENDERER_CLASS_ID = 0x0F00;
inline constexpr SClass_ID CTRL_FLOAT_CLASS_ID = 0x9003;
inline constexpr SClass_ID CTRL_POINT2_CLASS_ID = 0x9004;
inline constexpr SClass_ID CTRL_POINT3_CLASS_ID = 0x900B;
inline constexpr SClass_ID CTRL_POINT4_CLASS_ID = 0x9012;
// Asks NotifyDependents to reach dependents of every super class.
inline constexpr SClass_ID NOTIFY_ALL = 0xFFFFFFFF;

} // namespace TrelmSDK

template <>
struct std::hash<TrelmSDK::Class_ID> {
    size_t operator()(const TrelmSDK::Class_ID& id) const noexcept {
        return (static_cast<size_t>(id.PartA()) << 32) ^ id.PartB();
    }
};

template <>
struct std::hash<TrelmSDK::Interface_ID> {
    size_t operator()(const TrelmSDK::Interface_ID& id) const noexcept {
        return (static_cast<size_t>(id.PartA()) << 32) ^ id.PartB();
    }
};

using TrelmSDK::Class_ID;
using TrelmSDK::Interface_ID;
using TrelmSDK::SClass_ID;
