// SourceKey: the 64-bit hash by which every shader text is known, and the shader name made from it.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

using SourceKey = std::uint64_t;

// h = h * 65599 + byte, bytes taken as signed 8-bit values, wrapping modulo 2^64.
SourceKey SourceKeyOf(std::string_view text);

// "shader" followed by the key in unsigned decimal: the cache file's base name and the name the
// shading system knows the bytecode by.
std::string ShaderNameOf(SourceKey key);
