// Converters of the noise ops: each becomes a call of a noise function of the host's noise
// include, named after the noise, its result width D and its domain width N (name_D_N).
#include "op_converter_support.h"

namespace oslo {

namespace {

// The position arguments of a noise call: the position and an optional time, which stop at the
// first string (the name of an optional name/value pair).
struct NoiseCall {
    std::string suffix;   // "_D_N"
    std::string argument; // "(floatN(position[, time]))" without the closing parenthesis
    int resultWidth = 1;
};

bool IsFloatOrInt(const OSOSymbol* symbol) {
    return symbol && (symbol->type.is_float() || symbol->type.is_int());
}

NoiseCall MakeNoiseCall(OpConverterParams& p, size_t positionArg) {
    const size_t count = ArgCount(p);
    const OSOSymbol* time = ArgSymbol(p, positionArg + 1);
    const bool hasTime = positionArg + 1 < count && !(time && time->type.is_string_based());
    const int d = IsFloatOrInt(ArgSymbol(p, 0)) ? 1 : 3;
    const int n = (IsFloatOrInt(ArgSymbol(p, positionArg)) ? 1 : 3) + (hasTime ? 1 : 0);
    NoiseCall call;
    call.resultWidth = d;
    call.suffix = std::string("_") + std::to_string(d) + "_" + std::to_string(n);
    call.argument = std::string("(float") + std::to_string(n) + "(" + Arg(p, positionArg);
    if (hasTime) call.argument += ", " + Arg(p, positionArg + 1);
    call.argument += ")";
    return call;
}

OpConverter NamedNoise(std::string function) {
    return [function](OpConverterParams& p) {
        if (ArgCount(p) != 2 && ArgCount(p) != 3) return false;
        const NoiseCall call = MakeNoiseCall(p, 1);
        p.out << Arg(p, 0) << " = " << function << call.suffix << call.argument << ");";
        p.globals.features |= kFeatureNoise;
        return true;
    };
}

bool ConvertNoise(OpConverterParams& p) {
    if (ArgCount(p) < 2) return false;
    const OSOSymbol* typeSymbol = ArgSymbol(p, 1);
    p.globals.features |= kFeatureNoise;
    const std::string r = Arg(p, 0);
    if (!typeSymbol || !typeSymbol->type.is_string()) {
        // noise(position) without a name is OSL's unsigned Perlin noise.
        const NoiseCall call = MakeNoiseCall(p, 1);
        p.out << r << " = 0.5 * perlin" << call.suffix << call.argument << ") + (float"
              << call.resultWidth << ")0.5;";
        return true;
    }
    if (ArgCount(p) < 3) return false;
    std::string name;
    if (IsConstantString(p, 1, &name) && name == "gabor")
        RecordUnsupported(p.info, "Gabor noise not supported - will be approximated.");
    const std::string type = Arg(p, 1);
    const NoiseCall call = MakeNoiseCall(p, 2);
    const std::string half =
        std::string(") + (float") + std::to_string(call.resultWidth) + ")0.5;}";
    const auto test = [&](const char* noise) { return HashText(noise) + " == " + type; };
    const std::string next = NewLine(p) + "else if(";
    p.out << "if(" << test("cell") << ") {" << r << " = cellnoise" << call.suffix << call.argument
          << ");}" << next << test("perlin") << " || " << test("snoise") << " || " << test("gabor")
          << ") {" << r << " = perlin" << call.suffix << call.argument << ");}" << next
          << test("uperlin") << " || " << test("noise") << ") {" << r << " = 0.5 * perlin"
          << call.suffix << call.argument << half << next << test("hash") << ") {" << r
          << " = hashnoise" << call.suffix << call.argument << ");}" << next << test("simplex")
          << ") {" << r << " = simplexnoise" << call.suffix << call.argument << ", 0);}" << next
          << test("usimplex") << ") {" << r << " = 0.5 * simplexnoise" << call.suffix
          << call.argument << ", 0" << half << NewLine(p) << "else {" << r << " = 0;}";
    return true;
}

bool IsNumeric(const OSOSymbol* symbol) {
    return symbol && !symbol->type.is_string_based() && !symbol->type.is_closure_based();
}

// Periodic noise: position [time] then one period per coordinate; the call is name_D_N with the
// periods as a second floatN argument. `periodic` names the functions "p" + noise name.
struct PeriodicCall {
    std::string suffix;    // "_D_N"
    std::string arguments; // "(floatN(position[, time]), floatN(period[, timePeriod]))"
    int resultWidth = 1;
};

// False when the arguments from `positionArg` on are not position [time] and their periods.
bool MakePeriodicCall(OpConverterParams& p, size_t positionArg, PeriodicCall& call) {
    // The numeric arguments before any name/value option.
    size_t numeric = 0;
    while (positionArg + numeric < ArgCount(p) && IsNumeric(ArgSymbol(p, positionArg + numeric)))
        ++numeric;
    if (numeric != 2 && numeric != 4) return false;
    const bool hasTime = numeric == 4;
    const int d = IsFloatOrInt(ArgSymbol(p, 0)) ? 1 : 3;
    const int n = (IsFloatOrInt(ArgSymbol(p, positionArg)) ? 1 : 3) + (hasTime ? 1 : 0);
    const std::string width = std::to_string(n);
    call.resultWidth = d;
    call.suffix = std::string("_").append(std::to_string(d)).append("_").append(width);
    const size_t period = positionArg + (hasTime ? 2 : 1);
    // Built by appending: GCC 12 warns falsely about literal + string chains here.
    std::string& text = call.arguments;
    text.append("(float").append(width).append("(").append(Arg(p, positionArg));
    if (hasTime) text.append(", ").append(Arg(p, positionArg + 1));
    text.append("), float").append(width).append("(").append(Arg(p, period));
    if (hasTime) text.append(", ").append(Arg(p, period + 1));
    text.append("))");
    return true;
}

// psnoise: signed periodic Perlin noise.
bool ConvertPeriodicSignedNoise(OpConverterParams& p) {
    PeriodicCall call;
    if (ArgCount(p) < 3 || !MakePeriodicCall(p, 1, call)) return false;
    p.out << Arg(p, 0) << " = pperlin" << call.suffix << call.arguments << ";";
    p.globals.features |= kFeatureNoise;
    return true;
}

// pnoise: unsigned periodic Perlin noise, or the periodic noise of the named type. Simplex noise
// has no periodic form and gives 0, as an unknown name does.
bool ConvertPeriodicNoise(OpConverterParams& p) {
    if (ArgCount(p) < 3) return false;
    const OSOSymbol* typeSymbol = ArgSymbol(p, 1);
    const bool named = typeSymbol && typeSymbol->type.is_string();
    PeriodicCall call;
    if (!MakePeriodicCall(p, named ? 2 : 1, call)) return false;
    p.globals.features |= kFeatureNoise;
    const std::string r = Arg(p, 0);
    const std::string unsignedTail = " + (float" + std::to_string(call.resultWidth) + ")0.5;";
    if (!named) {
        p.out << r << " = 0.5 * pperlin" << call.suffix << call.arguments << unsignedTail;
        return true;
    }
    std::string name;
    if (IsConstantString(p, 1, &name) && name == "gabor")
        RecordUnsupported(p.info, "Gabor noise not supported - will be approximated.");
    const std::string type = Arg(p, 1);
    const auto test = [&](const char* noise) { return HashText(noise) + " == " + type; };
    const std::string next = NewLine(p) + "else if(";
    p.out << "if(" << test("cell") << ") {" << r << " = pcellnoise" << call.suffix << call.arguments
          << ";}" << next << test("perlin") << " || " << test("snoise") << " || " << test("gabor")
          << ") {" << r << " = pperlin" << call.suffix << call.arguments << ";}" << next
          << test("uperlin") << " || " << test("noise") << ") {" << r << " = 0.5 * pperlin"
          << call.suffix << call.arguments << unsignedTail << "}" << next << test("hash") << ") {"
          << r << " = phashnoise" << call.suffix << call.arguments << ";}" << NewLine(p) << "else {"
          << r << " = 0;}";
    return true;
}

} // namespace

void AddNoiseConverters(std::map<std::string, OpConverter>& c) {
    c["cellnoise"] = NamedNoise("cellnoise");
    c["hashnoise"] = NamedNoise("hashnoise");
    c["snoise"] = NamedNoise("perlin");
    c["noise"] = ConvertNoise;
    c["pnoise"] = ConvertPeriodicNoise;
    c["psnoise"] = ConvertPeriodicSignedNoise;
}

} // namespace oslo
