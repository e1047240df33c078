// The precompute builders, one per op that can feed a sampler choice or a string input. They run
// over the main section from the last instruction to the first, so a variable is "needed" (has
// a slot) exactly when a later instruction of the slice reads it.
#include "precompute_function.h"

#include "hlsl_names.h"
#include "string_ops.h"

#include <algorithm>
#include <climits>

namespace oslo {

namespace {

using Values = std::vector<PrecomputeVal>;

PrecomputeVal& At(PrecomputeRunState& state, int slot) {
    return state.values[static_cast<size_t>(slot)];
}

// 32-bit arithmetic that wraps instead of overflowing; a zero divisor and INT_MIN / -1 give 0,
// since the host must keep running whatever the shader's values.
int32_t Wrap(int64_t value) {
    return static_cast<int32_t>(static_cast<uint32_t>(static_cast<uint64_t>(value)));
}

int32_t Arithmetic(const std::string& op, int32_t a, int32_t b) {
    if (op == "add") return Wrap(static_cast<int64_t>(a) + b);
    if (op == "sub") return Wrap(static_cast<int64_t>(a) - b);
    if (op == "mul") return Wrap(static_cast<int64_t>(a) * b);
    if (b == 0 || (a == INT32_MIN && b == -1)) return 0;
    if (op == "div") return a / b;
    return a % b;
}

PrecomputeBuilder ValueBuilder(const std::string& op) {
    return [op](const Instruction& instruction, PrecomputeFunction& function,
                const PrecomputeInitParams& params) {
        const size_t count = op == "assign" ? 2 : 3;
        if (instruction.args.size() != count) return true;
        const int result = function.FindSlot(instruction.args[0]);
        if (result < 0) return true;
        function.initialValues[static_cast<size_t>(result)].producer = params.opIndex;
        const int a = function.Slot(instruction.args[1]);
        if (op == "assign") {
            function.steps.emplace_back(
                [result, a](PrecomputeRunState& state) {
                    At(state, result).str = At(state, a).str;
                    At(state, result).value = At(state, a).value;
                },
                params.opIndex);
            return true;
        }
        const int b = function.Slot(instruction.args[2]);
        function.steps.emplace_back(
            [op, result, a, b](PrecomputeRunState& state) {
                At(state, result).value = Arithmetic(op, At(state, a).value, At(state, b).value);
            },
            params.opIndex);
        return true;
    };
}

// The string of a result in the result map: its text, coded for the viewport by its hash.
PrecomputeVal StringResult(const std::string& text) {
    PrecomputeVal value;
    value.str = WidenText(text);
    value.value = StringHash(text);
    return value;
}

// endswith, format, strlen, concat and substr: the viewport cannot compute strings, so the
// result becomes an int input of the function, computed here on the CPU.
PrecomputeBuilder StringOpBuilder(const std::string& op, size_t minimumArgs) {
    return [op, minimumArgs](const Instruction& instruction, PrecomputeFunction& function,
                             const PrecomputeInitParams& params) {
        if (instruction.args.size() < minimumArgs) return true;
        const std::string input = op + "_" + std::to_string(params.opIndex);
        params.globals.additionalInputs.emplace("int", input);
        params.globals.precomputedExprs[params.opIndex] = input;
        const int result = function.FindSlot(instruction.args[0]);
        if (result >= 0)
            function.initialValues[static_cast<size_t>(result)].producer = params.opIndex;
        std::vector<int> operands;
        for (size_t i = 1; i < instruction.args.size(); ++i)
            operands.push_back(function.Slot(instruction.args[i]));
        function.steps.emplace_back(
            [op, input, result, operands](PrecomputeRunState& state) {
                std::vector<std::string> texts;
                std::vector<int32_t> ints;
                for (const int slot : operands) {
                    texts.push_back(NarrowText(At(state, slot).str));
                    ints.push_back(At(state, slot).value);
                }
                PrecomputeVal value;
                if (op == "strlen") {
                    value.value = static_cast<int32_t>(At(state, operands[0]).str.size());
                } else if (op == "endswith") {
                    value.value = StringEndsWith(texts[0], texts[1]) ? 1 : 0;
                } else if (op == "substr") {
                    const int length = operands.size() > 2 ? ints[2] : INT_MAX;
                    value = StringResult(StringSubstr(texts[0], ints[1], length));
                } else if (op == "concat") {
                    std::string joined;
                    for (const std::string& text : texts) joined += text;
                    value = StringResult(joined);
                } else {
                    const std::vector<std::string> argTexts(texts.begin() + 1, texts.end());
                    const std::vector<int32_t> argInts(ints.begin() + 1, ints.end());
                    value = StringResult(StringFormat(texts[0], argTexts, argInts));
                }
                if (result >= 0) {
                    At(state, result).str = value.str;
                    At(state, result).value = value.value;
                }
                state.results[input] = value;
            },
            params.opIndex);
        return true;
    };
}

// The sampler input of a lookup of the file held by `fileArg`: distinct for each producer of
// that variable that the backward walk has met, so lookups of different files get different
// samplers.
std::string SamplerName(const std::string& fileArg, const PrecomputeFunction& function, int slot) {
    std::string name = std::string("texture_").append(fileArg);
    const int producer = function.initialValues[static_cast<size_t>(slot)].producer;
    if (producer >= 0) name.append("_").append(std::to_string(producer));
    std::replace(name.begin(), name.end(), '$', '_');
    std::replace(name.begin(), name.end(), '.', '_');
    return name;
}

// Declares the sampler of a lookup (and its UDIM tiles) and remembers it for the converter.
std::string AddSampler(const Instruction& instruction, PrecomputeFunction& function,
                       const PrecomputeInitParams& params, int fileSlot) {
    const std::string& fileArg = instruction.args[1];
    const std::string sampler = SamplerName(fileArg, function, fileSlot);
    params.globals.additionalInputs.emplace("ksg_sampler2D", sampler);
    const auto tiles = params.globals.info.udimTiles.find(fileArg);
    if (tiles != params.globals.info.udimTiles.end())
        for (const std::string& tile : tiles->second)
            if (tile != "1001")
                params.globals.additionalInputs.emplace("ksg_sampler2D",
                                                        sampler + "___UDIM" + tile);
    params.globals.precomputedExprs[params.opIndex] = sampler;
    return sampler;
}

bool TextureBuilder(const Instruction& instruction, PrecomputeFunction& function,
                    const PrecomputeInitParams& params) {
    if (instruction.args.size() < 4) return true;
    const int file = function.Slot(instruction.args[1]);
    const std::string sampler = AddSampler(instruction, function, params, file);
    params.globals.additionalInputs.emplace("int", sampler + "_alphaMult");
    function.steps.emplace_back(
        [file, sampler](PrecomputeRunState& state) { state.results[sampler] = At(state, file); },
        params.opIndex);
    return true;
}

bool TextureInfoBuilder(const Instruction& instruction, PrecomputeFunction& function,
                        const PrecomputeInitParams& params) {
    if (instruction.args.size() != 4 && instruction.args.size() != 6) return true;
    const int found = function.Slot(instruction.args[0]);
    const int file = function.Slot(instruction.args[1]);
    const std::string sampler = AddSampler(instruction, function, params, file);
    function.steps.emplace_back(
        [found, file, sampler](PrecomputeRunState& state) {
            At(state, found).value = 1;
            state.results[sampler] = At(state, file);
        },
        params.opIndex);
    return true;
}

// An "if" matters only when the slice has a step inside its block: then the run skips the
// branch that the condition does not take.
bool IfBuilder(const Instruction& instruction, PrecomputeFunction& function,
               const PrecomputeInitParams& params) {
    if (instruction.args.size() != 1 || instruction.jumps.size() != 2) return true;
    const int elseStart = instruction.jumps[0], end = instruction.jumps[1];
    const bool stepInside = std::any_of(function.steps.begin(), function.steps.end(),
                                        [end](const auto& step) { return step.second < end; });
    if (!stepInside) return true;
    const int condition = function.Slot(instruction.args[0]);
    const int thenStart = params.opIndex + 1;
    function.steps.emplace_back(
        [condition, thenStart, elseStart, end](PrecomputeRunState& state) {
            if (At(state, condition).value == 0)
                state.skipRanges.emplace_back(thenStart, elseStart);
            else if (elseStart != end)
                state.skipRanges.emplace_back(elseStart, end);
        },
        params.opIndex);
    return true;
}

} // namespace

std::map<std::string, PrecomputeBuilder> PrecomputeBuilders() {
    std::map<std::string, PrecomputeBuilder> builders;
    builders["texture"] = TextureBuilder;
    builders["gettextureinfo"] = TextureInfoBuilder;
    builders["endswith"] = StringOpBuilder("endswith", 3);
    builders["format"] = StringOpBuilder("format", 2);
    builders["strlen"] = StringOpBuilder("strlen", 2);
    builders["concat"] = StringOpBuilder("concat", 3);
    builders["substr"] = StringOpBuilder("substr", 3);
    for (const char* op : {"assign", "sub", "add", "mul", "div", "mod"})
        builders[op] = ValueBuilder(op);
    builders["if"] = IfBuilder;
    return builders;
}

} // namespace oslo
