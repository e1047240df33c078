// Precompute functions: small CPU-side programs sliced out of a shader at translation time that
// compute, from a map's current parameter values, the extra inputs of its viewport function
// (which file each sampler shows, the codes of strings that string ops compute).
#pragma once

#include "hlsl_gen_globals.h"
#include "oso_data.h"

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

namespace oslo {

// One value slot of a precompute function.
struct PrecomputeVal {
    // The value of string variables (file names, formatted text).
    std::wstring str;
    // The value of int variables; for a string result in the result map, its StringHash.
    int32_t value = 0;
    // The instruction that produces the value; -1 while none is known.
    int producer = -1;
    bool fromParameter = false;
};

// The additional-input name of a run's result to its value.
using PrecomputeResults = std::map<std::string, PrecomputeVal>;

// What a step works on during one run.
struct PrecomputeRunState {
    std::vector<PrecomputeVal>& values;
    std::deque<std::pair<int, int>>& skipRanges;
    PrecomputeResults& results;
};

using PrecomputeStep = std::function<void(PrecomputeRunState&)>;

struct PrecomputeFunction {
    // Recorded during the backward walk, so the last entry is the first step to run.
    std::vector<std::pair<PrecomputeStep, int>> steps;
    // Instruction ranges [from, to) that the run skips; the innermost is at the back.
    std::deque<std::pair<int, int>> skipRanges;
    std::vector<PrecomputeVal> initialValues;
    std::vector<std::string> slotNames;
    std::map<std::string, int> slotOf;
    std::vector<PrecomputeVal> workValues;

    // The slot of a variable, created (which makes the variable needed) when it has none.
    int Slot(const std::string& name);
    // The slot of a variable, or -1 when it is not needed.
    int FindSlot(const std::string& name) const;
};

struct PrecomputeInitParams {
    const std::map<std::string, OSOSymbol>& symbols;
    HLSLGenGlobals& globals;
    int opIndex;
};

// The builders of the ops that take part in precompute functions, by op name.
std::map<std::string, PrecomputeBuilder> PrecomputeBuilders();

// Slices the main section into the shader's precompute function and stores it under `name`;
// also declares the additional inputs and the per-instruction expressions the converters use.
// False when a builder fails or a needed variable has no symbol.
bool BuildPrecomputeFunction(const CodeSection& mainSection, const OSOData& oso,
                             HLSLGenGlobals& globals, const std::string& name);

// Called once per parameter slot before the steps run, with the variable name and the slot to
// fill from the map's current parameter value.
using PrecomputeParameterCallback = std::function<void(const std::string&, PrecomputeVal&)>;

// Runs the precompute function stored under `name`; empty results when there is none.
PrecomputeResults RunPrecomputeFunction(const std::string& name,
                                        const PrecomputeParameterCallback& callback);

// Whether a precompute function is stored under `name`.
bool HasPrecomputeFunction(const std::string& name);

// Text to and from the wide strings of the slots (bytes widened one to one, so that narrowing
// gives back the same bytes for StringHash).
std::wstring WidenText(const std::string& text);
std::string NarrowText(const std::wstring& text);

} // namespace oslo
