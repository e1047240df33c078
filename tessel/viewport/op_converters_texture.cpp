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

std::string Sample(const std::string& sampler, const std::string& s, const std::string& t) {
    return sampler + ".tex.SampleLevel(" + sampler + ".smp, float2(" + s + ", " + t + "), 0)";
}

bool ConvertTexture(OpConverterParams& p, const _hlsl_info& inputs) {
    if (ArgCount(p) < 4) return false;
    const std::string sampler = PrecomputedExpression(p);
    // Without a sampler there is nothing valid to write.
    if (sampler.empty()) return false;
    std::string alpha, colorSpace;
    for (size_t i = 4; i + 1 < ArgCount(p); i += 2) {
        std::string option;
        if (!IsConstantString(p, i, &option)) return false;
        if (option == "alpha") {
            alpha = Arg(p, i + 1);
        } else if (option == "colorspace" && inputs.colorManagement) {
            colorSpace = Arg(p, i + 1);
            p.globals.features |= kFeatureColorManagement;
        }
    }
    const std::string r = Arg(p, 0), s = Arg(p, 2), t = Arg(p, 3);
    const std::string fetch = sampler + "_fetch";
    p.out << "{ float4 " << fetch << ";";
    const auto tiles = inputs.udimTiles.find(p.instruction.args[1]);
    if (tiles != inputs.udimTiles.end()) {
        for (const std::string& tile : tiles->second) {
            if (tile == "1001") continue;
            const int offset = std::atoi(tile.c_str()) - 1001;
            p.out << NewLine(p, 1) << "if (floor(" << s << ") == " << offset % 10 << " && floor("
                  << t << ") == " << offset / 10 << ")" << NewLine(p, 2) << fetch << " = "
                  << Sample(sampler + "___UDIM" + tile, s, t) << "; " << NewLine(p, 1) << "else";
        }
    }
    p.out << NewLine(p, 1) << fetch << " = " << Sample(sampler, s, t) << "; ";
    if (!colorSpace.empty())
        p.out << NewLine(p, 1) << fetch << " = apply_color_management(" << fetch << ", "
              << colorSpace << ");";
    p.out << NewLine(p, 1) << r << " = " << fetch << ".rgb * (" << sampler << "_alphaMult ? "
          << fetch << ".a : 1.0);";
    if (!alpha.empty()) p.out << NewLine(p, 1) << alpha << " = " << fetch << ".a; ";
    p.out << NewLine(p) << "}";
    return true;
}

bool ConvertTextureInfo(OpConverterParams& p) {
    if (ArgCount(p) != 4) return false;
    const std::string sampler = PrecomputedExpression(p);
    if (sampler.empty()) return false;
    const std::string f = Arg(p, 0), n = Arg(p, 2), x = Arg(p, 3);
    // Only the queries whose answer fits the destination are tested: "resolution" fills an
    // array of two, "channels" a single int; an assignment of the other shape would not compile.
    const OSOSymbol* destination = ArgSymbol(p, 3);
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
    c["gettextureinfo"] = ConvertTextureInfo;
    c["endswith"] = StringOp(2);
    c["strlen"] = StringOp(2);
    c["substr"] = StringOp(2);
    c["format"] = StringOp(3);
    c["concat"] = StringOp(3);
}

} // namespace oslo
