// Converters of the arithmetic, comparison, component and math-function ops: one HLSL statement
// each, mostly a direct intrinsic.
#include "op_converter_support.h"

namespace oslo {

namespace {

OpConverter Unary(std::string opening, uint32_t feature = 0) {
    return [opening, feature](OpConverterParams& p) {
        if (ArgCount(p) != 2) return false;
        p.out << Arg(p, 0) << opening << Arg(p, 1) << ");";
        p.globals.features |= feature;
        return true;
    };
}

// r = a <op> b;
OpConverter Binary(std::string op) {
    return [op](OpConverterParams& p) {
        if (ArgCount(p) != 3) return false;
        p.out << Arg(p, 0) << " = " << Arg(p, 1) << op << Arg(p, 2) << ";";
        return true;
    };
}

// r = (a <op> b) ? 1 : 0;
OpConverter Comparison(std::string op) {
    return [op](OpConverterParams& p) {
        if (ArgCount(p) != 3) return false;
        p.out << Arg(p, 0) << " = (" << Arg(p, 1) << op << Arg(p, 2) << ") ? 1 : 0;";
        return true;
    };
}

// r = f(a, b);
OpConverter BinaryFunction(std::string opening) {
    return [opening](OpConverterParams& p) {
        if (ArgCount(p) != 3) return false;
        p.out << Arg(p, 0) << opening << Arg(p, 1) << ", " << Arg(p, 2) << ");";
        return true;
    };
}

// An op written by a fixed pattern of its argument expressions.
template <typename Write>
OpConverter Fixed(size_t count, Write write) {
    return [count, write](OpConverterParams& p) {
        if (ArgCount(p) != count) return false;
        write(p);
        return true;
    };
}

bool ConvertDiv(OpConverterParams& p) {
    if (ArgCount(p) != 3) return false;
    const std::string r = Arg(p, 0);
    p.out << r << " = " << Arg(p, 1) << " / " << Arg(p, 2) << "; ";
    const OSOSymbol* result = ArgSymbol(p, 0);
    if (!result) return true;
    if (result->type.is_color())
        p.out << r << " = clamp(" << r << ", (float3)-1e9, (float3)1e9) * any(isfinite(" << r
              << "));";
    else if (result->type.is_float())
        p.out << r << " *= isfinite(" << r << ");";
    else if (result->type.is_vectriple())
        p.out << r << " = clamp(" << r << ", (float3)-1e30, (float3)1e30);";
    return true;
}

bool ConvertMod(OpConverterParams& p) {
    if (ArgCount(p) != 3) return false;
    const OSOSymbol* a = ArgSymbol(p, 1);
    const OSOSymbol* b = ArgSymbol(p, 2);
    const std::string r = Arg(p, 0), x = Arg(p, 1), y = Arg(p, 2);
    if (a && b && a->type.is_int() && b->type.is_int())
        p.out << r << " = " << x << " % " << y << ";";
    else
        p.out << r << " = " << x << " - " << y << " * floor(" << x << " / " << y << ");";
    return true;
}

bool ConvertAssign(OpConverterParams& p) {
    if (ArgCount(p) != 2) return false;
    const OSOSymbol* result = ArgSymbol(p, 0);
    const std::string r = Arg(p, 0), a = Arg(p, 1);
    if (result && result->type.is_matrix() && IsScalarArg(p, 1))
        p.out << r << " = float4x4(" << a << ", 0.0, 0.0, 0.0,  0.0, " << a
              << ", 0.0, 0.0,  0.0, 0.0, " << a << ", 0.0,  0.0, 0.0, 0.0, " << a << ");";
    else
        p.out << r << " = " << a << ";";
    return true;
}

bool ConvertHash(OpConverterParams& p) {
    if (ArgCount(p) != 2) return false;
    const OSOSymbol* source = ArgSymbol(p, 1);
    if (!source || !source->type.is_string()) return false;
    p.out << Arg(p, 0) << " = " << Arg(p, 1) << ";";
    return true;
}

bool ConvertArrayLength(OpConverterParams& p) {
    if (ArgCount(p) != 2) return false;
    const OSOSymbol* array = ArgSymbol(p, 1);
    if (!array || !array->type.is_sized_array()) {
        RecordMessage(p.info, "HLSL does not support run-time arraylength()");
        return false;
    }
    p.out << Arg(p, 0) << " = " << array->type.arraylength() << ";";
    return true;
}

} // namespace

void AddArithmeticConverters(std::map<std::string, OpConverter>& c) {
    const std::pair<const char*, const char*> unary[] = {
        {"sin", " = sin("},
        {"cos", " = cos("},
        {"tan", " = tan("},
        {"tanh", " = tanh("},
        {"sinh", " = sinh("},
        {"cosh", " = cosh("},
        {"acos", " = acos("},
        {"asin", " = asin("},
        {"atan", " = atan("},
        {"floor", " = floor("},
        {"trunc", " = trunc("},
        {"round", " = round("},
        {"ceil", " = ceil("},
        {"sign", " = sign("},
        {"fabs", " = abs("},
        {"abs", " = abs("},
        {"inversesqrt", " = rsqrt("},
        {"normalize", " = normalize("},
        {"length", " = length("},
        {"sqrt", " = sqrt("},
        {"isfinite", " = isfinite("},
        {"isinf", " = isinf("},
        {"isnan", " = isnan("},
        {"exp", " = exp("},
        {"exp2", " = exp2("},
        {"log", " = log("},
        {"log2", " = log2("},
        {"log10", " = log10("},
        {"transpose", " = transpose("},
        {"determinant", " = determinant("},
        {"Dx", " = ddx("},
    };
    for (const auto& [op, opening] : unary) c[op] = Unary(opening);
    c["erf"] = Unary(" = fast_erf(", kFeatureUtil);
    c["expm1"] = Unary(" = fast_expm1(", kFeatureUtil);
    c["wavelength_color"] = Unary(" = wavelength_color(", kFeatureUtil);
    c["blackbody"] = Unary(" = blackbody_rgb(", kFeatureUtil);

    c["Dy"] = Fixed(
        2, [](OpConverterParams& p) { p.out << Arg(p, 0) << " = -ddy(" << Arg(p, 1) << ");"; });
    c["Dz"] = Fixed(2, [](OpConverterParams& p) { p.out << Arg(p, 0) << " = 0.0;"; });
    c["erfc"] = Fixed(2, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = 1.0 - fast_erf(" << Arg(p, 1) << ");";
        p.globals.features |= kFeatureUtil;
    });
    c["logb"] = Fixed(2, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = floor(log2(" << Arg(p, 1) << "));";
    });
    c["neg"] =
        Fixed(2, [](OpConverterParams& p) { p.out << Arg(p, 0) << " = -(" << Arg(p, 1) << ");"; });
    c["compl"] =
        Fixed(2, [](OpConverterParams& p) { p.out << Arg(p, 0) << " = ~" << Arg(p, 1) << " ;"; });
    c["luminance"] = Fixed(2, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = dot(" << Arg(p, 1) << ", float3(0.2126f, 0.7152f, 0.0722f));";
    });
    c["calculatenormal"] = Fixed(2, [](OpConverterParams& p) {
        const std::string a = Arg(p, 1);
        p.out << Arg(p, 0) << " = cross(ddx(" << a << "), -ddy(" << a << "));";
    });
    c["area"] = Fixed(2, [](OpConverterParams& p) {
        const std::string a = Arg(p, 1);
        p.out << Arg(p, 0) << " = length(cross(ddx(" << a << "), -ddy(" << a << ")));";
    });
    c["filterwidth"] = Fixed(2, [](OpConverterParams& p) {
        const std::string a = Arg(p, 1);
        p.out << Arg(p, 0) << " = sqrt(pow(ddx(" << a << "),2.0) + pow(ddy(" << a << "),2.0));";
    });
    c["arraycopy"] =
        Fixed(2, [](OpConverterParams& p) { p.out << Arg(p, 0) << " = " << Arg(p, 1) << ";"; });
    c["hash"] = ConvertHash;
    c["arraylength"] = ConvertArrayLength;

    const std::pair<const char*, const char*> binary[] = {
        {"add", " + "},   {"sub", " - "},  {"mul", " * "},  {"bitand", " & "},
        {"bitor", " | "}, {"shr", " >> "}, {"shl", " << "},
    };
    for (const auto& [op, text] : binary) c[op] = Binary(text);
    const std::pair<const char*, const char*> comparisons[] = {
        {"lt", " < "},   {"le", " <= "}, {"gt", " > "},  {"ge", " >= "},
        {"neq", " != "}, {"eq", " == "}, {"xor", " ^ "},
    };
    for (const auto& [op, text] : comparisons) c[op] = Comparison(text);
    const std::pair<const char*, const char*> functions[] = {
        {"min", " = min("},           {"max", " = max("}, {"fmod", " = fmod("},
        {"atan2", " = atan2("},       {"dot", " = dot("}, {"cross", " = cross("},
        {"distance", " = distance("},
    };
    for (const auto& [op, opening] : functions) c[op] = BinaryFunction(opening);
    c["step"] = Fixed(3, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = (" << Arg(p, 2) << " < " << Arg(p, 1) << "?0.0f:1.0f);";
    });
    c["pow"] = Fixed(3, [](OpConverterParams& p) {
        const std::string r = Arg(p, 0), a = Arg(p, 1);
        p.out << r << " = safe_pow(" << a << ", " << Arg(p, 2) << ");" << r << " *= isfinite(" << a
              << ");";
    });
    const auto indexRead = Fixed(3, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = " << Arg(p, 1) << "[" << Arg(p, 2) << "];";
    });
    c["compref"] = indexRead;
    c["aref"] = indexRead;
    const auto indexWrite = Fixed(3, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << "[" << Arg(p, 1) << "] = " << Arg(p, 2) << ";";
    });
    c["compassign"] = indexWrite;
    c["aassign"] = indexWrite;
    c["div"] = ConvertDiv;
    c["mod"] = ConvertMod;

    c["mix"] = Fixed(4, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = lerp(" << Arg(p, 1) << ", " << Arg(p, 2) << ", " << Arg(p, 3)
              << ");";
    });
    c["smoothstep"] = Fixed(4, [](OpConverterParams& p) {
        const std::string a = Arg(p, 1);
        p.out << Arg(p, 0) << " = smoothstep(" << a << ", max(" << a << ", " << Arg(p, 2) << "), "
              << Arg(p, 3) << ");";
    });
    c["sincos"] = Fixed(3, [](OpConverterParams& p) {
        p.out << "sincos(" << Arg(p, 0) << ", " << Arg(p, 1) << ", " << Arg(p, 2) << ");";
    });
    c["mxcompref"] = Fixed(4, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = " << Arg(p, 1) << "[" << Arg(p, 2) << "][" << Arg(p, 3) << "];";
    });
    c["mxcompassign"] = Fixed(4, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << "[" << Arg(p, 1) << "][" << Arg(p, 2) << "] = " << Arg(p, 3) << ";";
    });
    const auto triple = Fixed(4, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = float3(" << Arg(p, 1) << ", " << Arg(p, 2) << ", " << Arg(p, 3)
              << ");";
    });
    // select(a, b, cond) takes b where cond is non-zero; a vector condition selects per component.
    c["select"] = Fixed(4, [](OpConverterParams& p) {
        p.out << Arg(p, 0) << " = (" << Arg(p, 3) << " != 0) ? " << Arg(p, 2) << " : " << Arg(p, 1)
              << ";";
    });
    c["point"] = triple;
    c["vector"] = triple;
    c["assign"] = ConvertAssign;
}

} // namespace oslo
