// Converters of texture lookups, texture queries and string ops. Their sampler names and string
// results come from the precompute pass, which stores them per instruction in precomputedExprs.
#include "op_converter_support.h"

namespace oslo {

namespace {

// The expression the precompute pass stored for this instruction; empty when there is none.
std::string PrecomputedExpression(const OpConverterParams& p) {
    const auto it = p.globals.precomputedExprs.find(p.opIndex);
    return it == p.globals.precomputedExprs.end() ? std::string() : it->second;
}

// How a lookup samples: at the top level, or with the derivatives the shader gave explicitly.
struct SampleCoordinates {
    std::string s, t;
    // "float2(dsdx, dtdx), float2(dsdy, dtdy)", empty without explicit derivatives.
    std::string gradients;
};

std::string Sample(const std::string& sampler, const SampleCoordinates& at) {
    const std::string position = "float2(" + at.s + ", " + at.t + ")";
    if (!at.gradients.empty())
        return sampler + ".tex.SampleGrad(" + sampler + ".smp, " + position + ", " + at.gradients +
               ")";
    return sampler + ".tex.SampleLevel(" + sampler + ".smp, " + position + ", 0)";
}

// The UDIM tile tests of a lookup at (s, t): one "if (...)" text per tile of the file-name
// argument other than 1001, with that tile's number.
std::vector<std::pair<std::string, std::string>> TileTests(const OpConverterParams& p,
                                                           const _hlsl_info& inputs,
                                                           const std::string& s,
                                                           const std::string& t) {
    std::vector<std::pair<std::string, std::string>> tests;
    const auto tiles = inputs.udimTiles.find(p.instruction.args[1]);
    if (tiles == inputs.udimTiles.end()) return tests;
    for (const std::string& tile : tiles->second) {
        if (tile == "1001") continue;
        const int offset = std::atoi(tile.c_str()) - 1001;
        tests.emplace_back("if (floor(" + s + ") == " + std::to_string(offset % 10) + " && floor(" +
                               t + ") == " + std::to_string(offset / 10) + ")",
                           tile);
    }
    return tests;
}

bool ConvertTexture(OpConverterParams& p, const _hlsl_info& inputs) {
    if (ArgCount(p) < 4) return false;
    const std::string sampler = PrecomputedExpression(p);
    // Without a sampler there is nothing valid to write.
    if (sampler.empty()) return false;
    std::string alpha, colorSpace;
    SampleCoordinates at;
    // texture(file, s, t, dsdx, dtdx, dsdy, dtdy, ...): explicit derivatives come before the
    // options, which always start with a name.
    size_t firstOption = 4;
    const OSOSymbol* fifth = ArgSymbol(p, 4);
    if (fifth && !fifth->type.is_string_based()) {
        if (ArgCount(p) < 8) return false;
        at.gradients = "float2(" + Arg(p, 4) + ", " + Arg(p, 5) + "), float2(" + Arg(p, 6) + ", " +
                       Arg(p, 7) + ")";
        firstOption = 8;
    }
    for (size_t i = firstOption; i + 1 < ArgCount(p); i += 2) {
        std::string option;
        if (!IsConstantString(p, i, &option)) return false;
        if (option == "alpha") {
            alpha = Arg(p, i + 1);
        } else if (option == "colorspace" && inputs.colorManagement) {
            colorSpace = Arg(p, i + 1);
            p.globals.features |= kFeatureColorManagement;
        }
    }
    const std::string r = Arg(p, 0);
    at.s = Arg(p, 2);
    at.t = Arg(p, 3);
    const std::string fetch = sampler + "_fetch";
    p.out << "{ float4 " << fetch << ";";
    for (const auto& [test, tile] : TileTests(p, inputs, at.s, at.t))
        p.out << NewLine(p, 1) << test << NewLine(p, 2) << fetch << " = "
              << Sample(sampler + "___UDIM" + tile, at) << "; " << NewLine(p, 1) << "else";
    p.out << NewLine(p, 1) << fetch << " = " << Sample(sampler, at) << "; ";
    if (!colorSpace.empty())
        p.out << NewLine(p, 1) << fetch << " = apply_color_management(" << fetch << ", "
              << colorSpace << ");";
    p.out << NewLine(p, 1) << r << " = " << fetch << ".rgb * (" << sampler << "_alphaMult ? "
          << fetch << ".a : 1.0);";
    if (!alpha.empty()) p.out << NewLine(p, 1) << alpha << " = " << fetch << ".a; ";
    p.out << NewLine(p) << "}";
    return true;
}

bool ConvertTextureInfo(OpConverterParams& p, const _hlsl_info& inputs) {
    // gettextureinfo(file, name, dest), or gettextureinfo(file, s, t, name, dest), which asks
    // about the UDIM tile at (s, t).
    if (ArgCount(p) != 4 && ArgCount(p) != 6) return false;
    const std::string base = PrecomputedExpression(p);
    if (base.empty()) return false;
    const size_t nameArg = ArgCount(p) - 2, destinationArg = ArgCount(p) - 1;
    const std::string f = Arg(p, 0), n = Arg(p, nameArg), x = Arg(p, destinationArg);
    std::string sampler = base;
    if (ArgCount(p) == 6) {
        // The tile's own size: its "_info" picked as texture picks the tile's sampler.
        sampler = base + "_tile";
        p.out << "{ float4 " << sampler << "_info = " << base << "_info;";
        for (const auto& [test, tile] : TileTests(p, inputs, Arg(p, 2), Arg(p, 3)))
            p.out << " " << test << " " << sampler << "_info = " << base << "___UDIM" << tile
                  << "_info;";
        p.out << NewLine(p);
    }
    // Only the queries whose answer fits the destination are tested: "resolution" fills an
    // array of two, "channels" a single int; an assignment of the other shape would not compile.
    const OSOSymbol* destination = ArgSymbol(p, destinationArg);
    const bool pair = destination && destination->type.arraylength() == 2;
    const bool single = destination && destination->type.is_int();
    if (pair)
        p.out << "if(" << HashText("resolution") << " == " << n << ") { " << x
              << "[0] = " << sampler << "_info.x; " << x << "[1] = " << sampler << "_info.y; " << f
              << " = 1; }" << NewLine(p) << "else ";
    if (single)
        p.out << "if(" << HashText("channels") << " == " << n << ") { " << x << " = 4; " << f
              << " = 1; }" << NewLine(p) << "else ";
    p.out << "{ " << f << " = 0; }";
    if (sampler != base) p.out << " }";
    return true;
}

OpConverter StringOp(size_t minimumArgs) {
    return [minimumArgs](OpConverterParams& p) {
        if (ArgCount(p) < minimumArgs) return false;
        const std::string input = PrecomputedExpression(p);
        if (input.empty()) return false;
        p.out << Arg(p, 0) << " = " << input << ";";
        return true;
    };
}

} // namespace

void AddTextureConverters(std::map<std::string, OpConverter>& c, const _hlsl_info& info) {
    // The UDIM tiles and the colour-management switch are read from the caller's inputs as they
    // were when the table was built.
    c["texture"] = [inputs = info](OpConverterParams& p) { return ConvertTexture(p, inputs); };
    c["gettextureinfo"] = [inputs = info](OpConverterParams& p) {
        return ConvertTextureInfo(p, inputs);
    };
    c["endswith"] = StringOp(2);
    c["strlen"] = StringOp(2);
    c["substr"] = StringOp(2);
    // format with nothing but its format string is a plain (constant) text.
    c["format"] = StringOp(2);
    c["concat"] = StringOp(3);
}

} // namespace oslo
