// The generator core: declarations, sections, structured control flow from OSL jumps, the
// signature and the accuracy measure of one translation.
#include "hlsl_generator.h"

#include "hlsl_names.h"
#include "precompute_function.h"

#include <sstream>

namespace oslo {

namespace {

void WriteTabs(std::ostream& out, int depth) {
    for (int i = 0; i < depth; ++i) out << '\t';
}

void WriteLine(std::ostream& out, int depth, const std::string& text) {
    WriteTabs(out, depth);
    out << text << '\n';
}

bool IsKind(const OSOData& oso, const std::string& name, int kind) {
    const auto it = oso.symbols.find(name);
    return it != oso.symbols.end() && it->second.symtype == kind;
}

// The length text of a sized array, "" for an unsized one.
std::string ArrayLength(const OSL::TypeSpec& type) {
    return type.is_unsized_array() ? std::string() : std::to_string(type.arraylength());
}

void DeclareArrayConstant(const OSOSymbol& symbol, HLSLGenGlobals& globals, int depth,
                          std::ostream& out) {
    WriteTabs(out, depth);
    const OSL::TypeSpec element = symbol.type.elementtype();
    out << HLSLTypeName(element, globals) << " " << HLSLName(symbol.name) << "["
        << ArrayLength(symbol.type) << "] = {";
    const std::vector<float>& values = symbol.floatDefaults;
    if (element.is_int()) {
        for (size_t i = 0; i < values.size(); ++i)
            out << (i ? "," : "") << static_cast<int>(values[i]);
    } else if (element.is_float()) {
        for (size_t i = 0; i < values.size(); ++i)
            out << (i ? "," : "") << FloatLiteral(values[i], false);
    } else if (element.is_triple()) {
        for (size_t i = 0; i + 2 < values.size(); i += 3)
            out << (i ? "," : "") << "float3(" << FloatLiteral(values[i], false) << ","
                << FloatLiteral(values[i + 1], false) << "," << FloatLiteral(values[i + 2], false)
                << ") ";
    } else if (element.is_string()) {
        // Strings are their hashes in the viewport, element by element.
        const std::vector<std::string>& texts = symbol.stringDefaults;
        for (size_t i = 0; i < texts.size(); ++i) out << (i ? "," : "") << StringHash(texts[i]);
    } else if (element.is_matrix()) {
        for (size_t i = 0; i + 15 < values.size(); i += 16) {
            out << (i ? "," : "") << "float4x4(";
            for (size_t k = 0; k < 16; ++k)
                out << (k ? "," : "") << FloatLiteral(values[i + k], false);
            out << ") ";
        }
    } else {
        RecordMessage(globals.info, "Unsupported array constant");
        globals.failed = true;
    }
    out << "};\n";
}

void DeclareVariable(const OSOSymbol& symbol, HLSLGenGlobals& globals, int depth,
                     std::ostream& out) {
    WriteTabs(out, depth);
    if (symbol.symtype == kOutputParam)
        out << HLSLName(symbol.name);
    else if (symbol.type.is_array())
        out << HLSLTypeName(symbol.type.elementtype(), globals) << " " << HLSLName(symbol.name)
            << "[" << ArrayLength(symbol.type) << "]";
    else
        out << HLSLTypeName(symbol.type, globals) << " " << HLSLName(symbol.name);
    if (!symbol.floatDefaults.empty() || !symbol.stringDefault.empty()) {
        out << " = ";
        std::string text;
        if (ConstantExpression(symbol, text)) {
            out << text;
        } else {
            RecordMessage(globals.info, "Unsupported constant");
            globals.failed = true;
        }
    }
    out << ";\n";
}

// The index of the instruction that ends the inlined body of a function call, when the body
// holds a "return" that must leave it early; -1 otherwise.
bool BodyHasReturn(const CodeSection& section, size_t callPosition, int target) {
    const int first = section.firstOpIndex;
    for (size_t i = callPosition + 1; i < section.instructions.size(); ++i) {
        if (first + static_cast<int>(i) >= target) break;
        if (section.instructions[i].opcode == "return") return true;
    }
    return false;
}

} // namespace

void CloseBlocks(int index, BlockStack& blocks, int& depth, std::ostream& out) {
    while (!blocks.empty() && blocks.back().opIndex == index) {
        const BlockEvent event = blocks.back();
        blocks.pop_back();
        switch (event.kind) {
        case BlockEvent::kElse:
            WriteLine(out, --depth, "} else {");
            ++depth;
            break;
        case BlockEvent::kEndIf:
            WriteLine(out, --depth, "}");
            break;
        case BlockEvent::kLoopStart:
            WriteLine(out, depth++, "[fastopt] for(;;) {");
            break;
        case BlockEvent::kLoopTest:
            WriteLine(out, depth, "if(0 == " + event.text + ") break;");
            break;
        case BlockEvent::kLoopEnd:
            WriteLine(out, --depth, "}");
            out << '\n';
            break;
        case BlockEvent::kEndFunctionWithReturn:
            WriteLine(out, --depth, "} while(false);");
            break;
        case BlockEvent::kDoLoopStart:
            WriteLine(out, depth++, "{");
            WriteLine(out, depth, "bool __first = true;");
            WriteLine(out, depth++, "[fastopt] for(;;) {");
            break;
        case BlockEvent::kDoLoopTest:
            WriteLine(out, depth, "if(!__first && 0 == " + event.text + ") break;");
            WriteLine(out, depth, "__first = false;");
            break;
        case BlockEvent::kDoLoopEnd:
            WriteLine(out, --depth, "}");
            WriteLine(out, --depth, "}");
            out << '\n';
            break;
        default:
            break;
        }
    }
}

bool ConvertInstruction(OpConverterParams& params) {
    WriteTabs(params.out, params.depth);
    ++params.info.opCount;
    const std::string& op = params.instruction.opcode;
    const auto it = params.globals.converters.find(op);
    if (it != params.globals.converters.end() && it->second(params)) {
        params.out << '\n';
        return true;
    }
    if (op == "functioncall") return false;
    RecordUnsupported(params.info, "Unknown OPcode '" + op + "' - conversion failed.");
    return false;
}

bool GenerateSection(const CodeSection& section, const OSOData& oso, int depth,
                     HLSLGenGlobals& globals, std::ostream& out, _hlsl_info& info) {
    BlockStack blocks;
    int index = section.firstOpIndex;
    for (size_t i = 0; i < section.instructions.size(); ++i, ++index) {
        const Instruction& instruction = section.instructions[i];
        CloseBlocks(index, blocks, depth, out);
        OpConverterParams params{instruction, oso.symbols, blocks, depth,
                                 globals,     out,         index,  info};
        if (ConvertInstruction(params)) continue;
        if (instruction.opcode != "functioncall" || instruction.args.size() != 1 ||
            instruction.jumps.size() != 1)
            return false;
        const int target = instruction.jumps[0];
        if (BodyHasReturn(section, i, target)) {
            out << "do { ";
            ++depth;
            blocks.push_back({BlockEvent::kEndFunctionWithReturn, target, {}});
        }
        out << "//" << VariableName(instruction.args[0], oso.symbols, globals) << '\n';
    }
    // Blocks that end with the section (a parameter's default code has no closing "end").
    CloseBlocks(index, blocks, depth, out);
    return true;
}

void DeclareSymbols(const std::map<std::string, OSOSymbol>& symbols, HLSLGenGlobals& globals,
                    int depth, std::ostream& out) {
    for (const auto& [name, symbol] : symbols) {
        if (symbol.type.structure() != 0) continue;
        const bool array = symbol.type.is_array();
        if (array && (symbol.symtype == kConst || symbol.symtype == kOutputParam))
            DeclareArrayConstant(symbol, globals, depth, out);
        else if (symbol.symtype == kLocal || symbol.symtype == kTemp ||
                 symbol.symtype == kOutputParam)
            DeclareVariable(symbol, globals, depth, out);
    }
}

bool GenerateBody(const OSOData& oso, std::string& body, HLSLGenGlobals& globals,
                  const std::string& name, _hlsl_info& info) {
    std::ostringstream out;
    const int depth = 1;
    info.opCount = 0;
    info.unsupportedCount = 0;
    info.accuracy = 0;

    DeclareSymbols(oso.symbols, globals, depth, out);
    out << '\n';

    for (const auto& [sectionName, section] : oso.sections) {
        if (!IsKind(oso, sectionName, kParam)) continue;
        const std::string flag = std::string("if(UseDefault_") + HLSLName(sectionName) + ")";
        WriteLine(out, depth, flag);
        WriteLine(out, depth, "{");
        if (!GenerateSection(section, oso, depth + 1, globals, out, info)) return false;
        WriteLine(out, depth, "}");
        out << '\n';
    }
    for (const auto& [sectionName, section] : oso.sections) {
        if (!IsKind(oso, sectionName, kOutputParam)) continue;
        if (!GenerateSection(section, oso, depth, globals, out, info)) return false;
        out << '\n';
    }
    const auto main = oso.sections.find("___main___");
    if (main == oso.sections.end()) return false;
    if (!BuildPrecomputeFunction(main->second, oso, globals, name)) return false;
    if (!GenerateSection(main->second, oso, depth, globals, out, info)) return false;

    if (info.opCount == 0) {
        // Nothing was attempted, so nothing was lost.
        info.accuracy = 100;
    } else {
        // Single precision throughout, so that 1 of 10 unsupported is 90 and not 89.
        const float q = static_cast<float>(info.unsupportedCount) / info.opCount;
        info.accuracy = static_cast<int>((1.0f - q) * 100.0f);
    }
    body = out.str();
    return true;
}

std::string GenerateSignature(const OSOData& oso, const std::string& name,
                              HLSLGenGlobals& globals) {
    std::vector<std::string> entries;
    for (const OSOSymbol& symbol : oso.symbolList) {
        if (symbol.symtype != kParam || symbol.type.structure() != 0) continue;
        std::string entry =
            HLSLTypeName(symbol.type.elementtype(), globals) + " " + HLSLName(symbol.name);
        if (symbol.type.is_array()) entry += std::string("[") + ArrayLength(symbol.type) + "]";
        // An HLSL function cannot take an array whose length is only known at run time.
        if (symbol.type.is_unsized_array()) {
            RecordMessage(globals.info, "Unsupported type");
            globals.failed = true;
        }
        entries.push_back(entry);
    }
    for (const auto& section : oso.sections)
        if (IsKind(oso, section.first, kParam))
            entries.push_back(std::string("int UseDefault_") + HLSLName(section.first));
    const auto addInputs = [&](auto&& wanted) {
        for (const auto& [type, input] : globals.additionalInputs)
            if (wanted(type)) entries.push_back(type + " " + input);
    };
    addInputs([](const std::string& type) { return type == "ksg_sampler2D"; });
    addInputs([](const std::string& type) { return type == "float4"; });
    addInputs([](const std::string& type) { return type == "int"; });
    addInputs([](const std::string& type) {
        return type != "ksg_sampler2D" && type != "float4" && type != "int";
    });
    for (const OSOSymbol& symbol : oso.symbolList) {
        if (symbol.symtype != kOutputParam || symbol.type.structure() != 0) continue;
        std::string entry = std::string("out ") + HLSLTypeName(symbol.type.elementtype(), globals) +
                            " " + HLSLName(symbol.name);
        if (symbol.type.is_array()) entry += std::string("[") + ArrayLength(symbol.type) + "]";
        entries.push_back(entry);
        if (symbol.type.is_string()) {
            RecordUnsupported(globals.info, "Dynamic string outputs (per object) not supported");
            globals.info.accuracy /= 2;
        }
    }
    std::string signature = "void " + name + "(";
    for (size_t i = 0; i < entries.size(); ++i) signature += (i ? ", " : "") + entries[i];
    return signature + ")";
}

std::vector<std::string> IncludeList(const HLSLGenGlobals& globals) {
    std::string colorManagement = "predefine:";
    for (const std::string& piece : globals.info.colorManagementHLSL) colorManagement += piece;
    const std::pair<uint32_t, std::string> entries[] = {
        {kFeatureNoise, "include:ksg_noise.h"},
        {kFeatureNonConsolidatable, "nonconsolidatable"},
        {kFeatureUtil, "include:ksg_util.h"},
        {kFeatureObjectColor, "predefine:float4 objectColor : WIRECOLOR;\n"},
        {kFeatureObjectIds, "predefine:int objectIds[3] : ITEM_IDS;\n"},
        // The name and value sets are int4 rather than int[4]: getattribute casts them to int4,
        // which not every HLSL compiler allows for arrays.
        {kFeatureObjectInts, "predefine:int4 objectIntNames : ITEM_INT_ATTRIB_NAMES;\n"
                             "int4 objectInts : ITEM_INT_ATTRIBS;\n"},
        {kFeatureObjectColors, "predefine:int4 objectColorNames : ITEM_COLOR_ATTRIB_NAMES;\n"
                               "float4x4 objectColors : ITEM_COLOR_ATTRIBS;\n"},
        {kFeatureColorManagement, colorManagement},
    };
    std::vector<std::string> list;
    for (const auto& [bit, entry] : entries)
        if (globals.features & bit) list.push_back(entry);
    return list;
}

bool GenerateHLSL(const std::string& name, const std::string& osoText, _hlsl_info& info,
                  std::string* output) {
    info.accuracy = 0;
    if (output == nullptr) return false;

    OSOData oso;
    if (!oso.parse_memory(osoText)) return false;

    HLSLGenGlobals globals(info);
    std::string body;
    if (!GenerateBody(oso, body, globals, name, info)) return false;
    const std::string signature = GenerateSignature(oso, name, globals);
    if (globals.failed) return false;

    const std::vector<std::string> includes = IncludeList(globals);
    output->clear();
    if (!includes.empty()) {
        *output += "/* == ADDITIONAL SETTINGS: \n";
        for (const std::string& entry : includes) *output += entry + "\n";
        *output += "*/\n";
    }
    *output += signature + "\n{\n" + body + "\n}\n";
    return true;
}

} // namespace oslo
