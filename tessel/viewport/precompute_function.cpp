// Building precompute functions as backward slices of a shader's main section, the process-wide
// table that keeps them, and their runs.
#include "precompute_function.h"

#include "hlsl_names.h"

#include <algorithm>
#include <mutex>

namespace oslo {

namespace {

// Every precompute function built, by shader (node) name. Written by translations and read by
// runs, both on the host's main thread in the module; the mutex keeps other callers (tests, the
// CLI) safe too. Entries live until the process ends.
std::mutex g_functionsMutex;
std::map<std::string, PrecomputeFunction>& Functions() {
    static std::map<std::string, PrecomputeFunction> functions;
    return functions;
}

// Fills the translation-time values of the needed variables; false names the first needed
// variable without a symbol.
bool FillInitialValues(PrecomputeFunction& function,
                       const std::map<std::string, OSOSymbol>& symbols, HLSLGenGlobals& globals) {
    for (size_t slot = 0; slot < function.slotNames.size(); ++slot) {
        const std::string& name = function.slotNames[slot];
        const auto it = symbols.find(name);
        if (it == symbols.end()) {
            RecordMessage(globals.info, "Unknown variable '" + name + "'");
            return false;
        }
        const OSOSymbol& symbol = it->second;
        PrecomputeVal& value = function.initialValues[slot];
        const bool parameter = symbol.symtype == kParam;
        value.fromParameter = parameter;
        if (symbol.symtype != kConst && !parameter) continue;
        // A parameter starts at its declared default, which the map's callback then replaces.
        if (symbol.type.is_int() && symbol.floatDefaults.size() == 1)
            value.value = static_cast<int32_t>(symbol.floatDefaults[0]);
        else if (symbol.type.is_string())
            value.str = WidenText(symbol.stringDefault);
    }
    return true;
}

} // namespace

int PrecomputeFunction::Slot(const std::string& name) {
    const auto it = slotOf.find(name);
    if (it != slotOf.end()) return it->second;
    const int slot = static_cast<int>(slotNames.size());
    slotNames.push_back(name);
    initialValues.emplace_back();
    slotOf.emplace(name, slot);
    return slot;
}

int PrecomputeFunction::FindSlot(const std::string& name) const {
    const auto it = slotOf.find(name);
    return it == slotOf.end() ? -1 : it->second;
}

std::wstring WidenText(const std::string& text) {
    std::wstring wide;
    wide.reserve(text.size());
    for (const char c : text) wide.push_back(static_cast<wchar_t>(static_cast<unsigned char>(c)));
    return wide;
}

std::string NarrowText(const std::wstring& text) {
    std::string narrow;
    narrow.reserve(text.size());
    for (const wchar_t c : text) narrow.push_back(static_cast<char>(c));
    return narrow;
}

bool BuildPrecomputeFunction(const CodeSection& mainSection, const OSOData& oso,
                             HLSLGenGlobals& globals, const std::string& name) {
    PrecomputeFunction function;
    const int first = mainSection.firstOpIndex;
    for (size_t i = mainSection.instructions.size(); i-- > 0;) {
        const Instruction& instruction = mainSection.instructions[i];
        const auto builder = globals.precomputeBuilders.find(instruction.opcode);
        if (builder == globals.precomputeBuilders.end()) continue;
        const PrecomputeInitParams params{oso.symbols, globals, first + static_cast<int>(i)};
        if (!builder->second(instruction, function, params)) return false;
    }
    if (!FillInitialValues(function, oso.symbols, globals)) return false;
    const std::lock_guard<std::mutex> lock(g_functionsMutex);
    // A shader without steps must not run what an earlier shader of that name left behind.
    if (function.steps.empty())
        Functions().erase(name);
    else
        Functions()[name] = std::move(function);
    return true;
}

PrecomputeResults RunPrecomputeFunction(const std::string& name,
                                        const PrecomputeParameterCallback& callback) {
    PrecomputeResults results;
    const std::lock_guard<std::mutex> lock(g_functionsMutex);
    const auto it = Functions().find(name);
    if (it == Functions().end()) return results;
    PrecomputeFunction& function = it->second;
    function.skipRanges.clear();
    function.workValues = function.initialValues;
    for (const auto& [variable, slot] : function.slotOf) {
        PrecomputeVal& value = function.workValues[static_cast<size_t>(slot)];
        if (value.fromParameter && callback) callback(variable, value);
    }
    PrecomputeRunState state{function.workValues, function.skipRanges, results};
    for (auto step = function.steps.rbegin(); step != function.steps.rend(); ++step) {
        const int index = step->second;
        while (!function.skipRanges.empty() && function.skipRanges.back().second <= index)
            function.skipRanges.pop_back();
        if (!function.skipRanges.empty() && function.skipRanges.back().first <= index) continue;
        step->first(state);
    }
    return results;
}

bool HasPrecomputeFunction(const std::string& name) {
    const std::lock_guard<std::mutex> lock(g_functionsMutex);
    return Functions().count(name) != 0;
}

} // namespace oslo
