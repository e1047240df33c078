// How OSL symbols are written in HLSL: names, constants, types and string hashes.
#pragma once

#include "hlsl_gen_globals.h"

#include <cstdint>
#include <map>
#include <string>
#include <string_view>

namespace oslo {

// The HLSL expression for an instruction argument; records an unknown variable and sets
// `failed` when the name has no symbol or no expression.
std::string VariableName(const std::string& name, const std::map<std::string, OSOSymbol>& symbols,
                         HLSLGenGlobals& globals);

// The HLSL expression for a known symbol (constants inline, globals through globalVars).
std::string SymbolExpression(const OSOSymbol& symbol, HLSLGenGlobals& globals);

// "$" and "." become "_" and a "_" is appended, so that no shader name meets an HLSL keyword.
std::string HLSLName(std::string_view name);

// A float literal: six significant digits when they read back as the same float (1 gives
// 1.00000 with `showPoint`), otherwise nine, so that the viewport computes with the very constant
// the CPU shading system uses (hash noise of a rounded constant is a different pattern).
std::string FloatLiteral(float value, bool showPoint);

// The literal of a constant symbol; false when its type and defaults do not fit.
bool ConstantExpression(const OSOSymbol& symbol, std::string& text);

// The HLSL type of a scalar or of an array's elements; records and fails on closures and
// types the viewport cannot hold.
std::string HLSLTypeName(const OSL::TypeSpec& type, HLSLGenGlobals& globals);

// The viewport's integer for an OSL string: the low 32 bits of OpenImageIO's farmhash.
int32_t StringHash(std::string_view text);

// The text of StringHash in decimal.
std::string HashText(std::string_view text);

} // namespace oslo
