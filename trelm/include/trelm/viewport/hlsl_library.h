// The host's viewport HLSL library: the definitions that generated viewport functions rely on
// (shading state, matrices, samplers, noise, colour helpers), and the assembly of a library
// entry into HLSL that a shader compiler accepts.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace TrelmSDK::Graphics::ksg {

// What every viewport function is compiled with: the shading state, the view and object
// matrices, the image resolution, the 2D sampler type and safe_pow.
std::string_view BaseLibrary();

// The text of an include that a library entry may name ("ksg_noise.h", "ksg_util.h"); empty
// for a name the host does not have.
std::string_view IncludeFile(std::string_view name);

// Resolves a library entry's include list, in order: "include:NAME" adds that include,
// "predefine:TEXT" adds TEXT, any other entry only tells the generator how to treat the entry.
// Returns the base library, the resolved entries and the function text; on an unknown include
// returns an empty text and sets error.
std::string AssembleLibraryEntry(const std::vector<std::string>& includeList,
                                 std::string_view functionText, std::string& error);

} // namespace TrelmSDK::Graphics::ksg
