// Names, literals and types of OSL symbols in the generated HLSL.
#include "hlsl_names.h"

#include <OpenImageIO/hash.h>

#include <cmath>
#include <cstdlib>
#include <iomanip>
#include <sstream>

namespace oslo {

namespace {

void ReportUnknownVariable(const std::string& name, HLSLGenGlobals& globals) {
    RecordMessage(globals.info, "Unknown variable '" + name + "'");
    globals.failed = true;
}

void ReportFailure(const std::string& text, HLSLGenGlobals& globals) {
    RecordMessage(globals.info, text);
    globals.failed = true;
}

} // namespace

void RecordMessage(_hlsl_info& info, const std::string& text) {
    ++info.messages[text];
}

void RecordUnsupported(_hlsl_info& info, const std::string& text) {
    ++info.unsupportedCount;
    RecordMessage(info, text);
}

std::string VariableName(const std::string& name, const std::map<std::string, OSOSymbol>& symbols,
                         HLSLGenGlobals& globals) {
    const auto it = symbols.find(name);
    if (it == symbols.end()) {
        ReportUnknownVariable(name, globals);
        return {};
    }
    return SymbolExpression(it->second, globals);
}

std::string SymbolExpression(const OSOSymbol& symbol, HLSLGenGlobals& globals) {
    if (symbol.symtype == kConst && !symbol.type.is_array()) {
        std::string text;
        if (ConstantExpression(symbol, text)) return text;
        ReportUnknownVariable(symbol.name, globals);
        return {};
    }
    if (symbol.symtype != kGlobal) return HLSLName(symbol.name);
    const auto it = globals.globalVars.find(symbol.name);
    if (it == globals.globalVars.end()) {
        ReportUnknownVariable(symbol.name, globals);
        return {};
    }
    return it->second;
}

std::string HLSLName(std::string_view name) {
    std::string result(name);
    for (char& c : result)
        if (c == '$' || c == '.') c = '_';
    result += '_';
    return result;
}

std::string FloatLiteral(float value, bool showPoint) {
    std::ostringstream out;
    if (showPoint) out.setf(std::ios::showpoint);
    out << value;
    std::string text = out.str();
    if (std::isfinite(value) && std::strtof(text.c_str(), nullptr) != value) {
        out.str({});
        out << std::setprecision(9) << value;
        text = out.str();
    }
    return text;
}

bool ConstantExpression(const OSOSymbol& symbol, std::string& text) {
    const OSL::TypeSpec& type = symbol.type;
    if (type.is_closure_based() || type.is_array()) return false;
    const std::vector<float>& values = symbol.floatDefaults;
    std::ostringstream out;
    const auto lit = [](float v) { return FloatLiteral(v, true); };
    if (type.is_float()) {
        if (values.size() != 1) return false;
        out << lit(values[0]);
    } else if (type.is_int()) {
        if (values.size() != 1) return false;
        out << static_cast<int>(values[0]);
    } else if (type.is_triple()) {
        if (values.size() != 3) return false;
        out << "float3(" << lit(values[0]) << ", " << lit(values[1]) << ", " << lit(values[2])
            << ")";
    } else if (type.is_matrix()) {
        if (values.size() != 16) return false;
        out << "float4x4(";
        for (size_t i = 0; i < 16; ++i) out << (i ? ", " : "") << lit(values[i]);
        out << ") ";
    } else if (type.is_string()) {
        out << StringHash(symbol.stringDefault) << "/*" << symbol.stringDefault << "*/";
    } else {
        return false;
    }
    text = out.str();
    return true;
}

std::string HLSLTypeName(const OSL::TypeSpec& type, HLSLGenGlobals& globals) {
    if (type.is_closure()) {
        ReportFailure("'closure' not supported", globals);
        return "closure";
    }
    if (!type.is_closure_based() && type.structure() == 0) {
        const OIIO::TypeDesc element = type.simpletype().elementtype();
        if (element == OIIO::TypeDesc::TypeInt || element == OIIO::TypeDesc::TypeString)
            return "int";
        if (element == OIIO::TypeDesc::TypeFloat) return "float";
        if (element.basetype == OIIO::TypeDesc::FLOAT && element.aggregate == OIIO::TypeDesc::VEC3)
            return "float3";
        if (element == OIIO::TypeDesc::TypeMatrix) return "float4x4";
    }
    ReportFailure("Unsupported type", globals);
    return "unsupported";
}

int32_t StringHash(std::string_view text) {
    const uint64_t hash = OIIO::farmhash::Hash(text.data(), text.size());
    return static_cast<int32_t>(static_cast<uint32_t>(hash & 0xffffffffu));
}

std::string HashText(std::string_view text) {
    return std::to_string(StringHash(text));
}

} // namespace oslo
