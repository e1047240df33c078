// HLSLGenGlobals: the state of one OSO-to-HLSL translation, and the types the op converters share
// with the generator (OpConverterParams, BlockEvent).
#pragma once

#include "hlsl_info.h"
#include "oso_data.h"

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <ostream>
#include <set>
#include <string>
#include <utility>

namespace oslo {

class HLSLGenGlobals;

// One pending piece of control-flow text, written before the instruction at opIndex.
struct BlockEvent {
    enum Kind : int {
        kElse = 0,
        kEndIf = 1,
        kLoopStart = 2,
        kLoopTest = 3,
        kLoopEnd = 4,
        kEndFunctionWithReturn = 5,
        kDoLoopStart = 6,
        kDoLoopTest = 7,
        kDoLoopEnd = 8,
    };
    int kind = kEndIf;
    int opIndex = 0;
    // The condition variable of loop tests.
    std::string text;
};

using BlockStack = std::deque<BlockEvent>;

struct OpConverterParams {
    const Instruction& instruction;
    const std::map<std::string, OSOSymbol>& symbols;
    BlockStack& blocks;
    int& depth;
    HLSLGenGlobals& globals;
    std::ostream& out;
    int opIndex;
    _hlsl_info& info;
};

using OpConverter = std::function<bool(OpConverterParams&)>;

struct PrecomputeFunction;
struct PrecomputeInitParams;
using PrecomputeBuilder =
    std::function<bool(const Instruction&, PrecomputeFunction&, const PrecomputeInitParams&)>;

// Bits of HLSLGenGlobals::features; each adds one entry to the include list.
enum FeatureBit : uint32_t {
    kFeatureNoise = 1,
    kFeatureNonConsolidatable = 2,
    kFeatureUtil = 4,
    kFeatureObjectColor = 8,
    kFeatureObjectIds = 16,
    kFeatureObjectInts = 32,
    kFeatureObjectColors = 64,
    kFeatureColorManagement = 128,
};

class HLSLGenGlobals {
public:
    explicit HLSLGenGlobals(_hlsl_info& info);

    std::map<std::string, OpConverter> converters;
    std::map<std::string, std::string> globalVars;
    uint32_t features = 0;
    bool failed = false;
    std::map<std::string, PrecomputeBuilder> precomputeBuilders;
    // (HLSL type, input name) of the function's extra inputs computed on the CPU.
    std::set<std::pair<std::string, std::string>> additionalInputs;
    // Global instruction index to the expression that stands for that instruction's result.
    std::map<int, std::string> precomputedExprs;
    _hlsl_info& info;
};

// Fill the converter table, one family per call (op_converters_*.cpp).
void AddArithmeticConverters(std::map<std::string, OpConverter>& converters);
void AddControlFlowConverters(std::map<std::string, OpConverter>& converters);
void AddColorConverters(std::map<std::string, OpConverter>& converters);
void AddSpaceConverters(std::map<std::string, OpConverter>& converters);
void AddNoiseConverters(std::map<std::string, OpConverter>& converters);
void AddAttributeConverters(std::map<std::string, OpConverter>& converters);
void AddTextureConverters(std::map<std::string, OpConverter>& converters, const _hlsl_info& info);
void AddUnsupportedConverters(std::map<std::string, OpConverter>& converters);

} // namespace oslo
