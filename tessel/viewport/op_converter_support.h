// Small helpers shared by the op converters: argument expressions, symbol types and constants.
#pragma once

#include "hlsl_gen_globals.h"
#include "hlsl_names.h"

#include <algorithm>
#include <string>

namespace oslo {

inline size_t ArgCount(const OpConverterParams& p) {
    return p.instruction.args.size();
}

// The HLSL expression of argument i.
inline std::string Arg(OpConverterParams& p, size_t i) {
    return VariableName(p.instruction.args[i], p.symbols, p.globals);
}

// The symbol of argument i, or null when it is unknown.
inline const OSOSymbol* ArgSymbol(const OpConverterParams& p, size_t i) {
    if (i >= p.instruction.args.size()) return nullptr;
    const auto it = p.symbols.find(p.instruction.args[i]);
    return it == p.symbols.end() ? nullptr : &it->second;
}

// True when argument i is a constant string; its text goes to value.
inline bool IsConstantString(const OpConverterParams& p, size_t i, std::string* value = nullptr) {
    const OSOSymbol* symbol = ArgSymbol(p, i);
    if (!symbol || symbol->symtype != kConst || !symbol->type.is_string()) return false;
    if (value) *value = symbol->stringDefault;
    return true;
}

// True when argument i is a float or an int (not an array).
inline bool IsScalarArg(const OpConverterParams& p, size_t i) {
    const OSOSymbol* symbol = ArgSymbol(p, i);
    return symbol && (symbol->type.is_float() || symbol->type.is_int());
}

// A line break followed by the indentation of the current depth plus extra levels, for
// converters whose text spans several lines.
inline std::string NewLine(const OpConverterParams& p, int extra = 0) {
    std::string text = "\n";
    text.append(static_cast<size_t>(std::max(0, p.depth + extra)), '\t');
    return text;
}

} // namespace oslo
