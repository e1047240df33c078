// Converters of colour construction and colour-space transforms, which call the conversion
// functions of the host's utility include.
#include "op_converter_support.h"

namespace oslo {

namespace {

enum class Direction { ToRGB, FromRGB };

// The conversion function between RGB and the colour space of argument i: empty for RGB, for a
// space that is not a constant, and (with a message) for a space the viewport does not know.
std::string SpaceConversion(OpConverterParams& p, size_t i, Direction direction) {
    std::string space;
    if (!IsConstantString(p, i, &space)) return {};
    if (space == "rgb" || space == "RGB") return {};
    if (space == "hsv" || space == "hsl" || space == "YIQ" || space == "XYZ")
        return direction == Direction::ToRGB ? space + "_to_rgb" : "rgb_to_" + space;
    RecordUnsupported(p.info, "Unsupported color space '" + space + "', using 'rgb'");
    return {};
}

bool ConvertColor(OpConverterParams& p) {
    const size_t count = ArgCount(p);
    if (count != 4 && count != 5) return false;
    const std::string function = count == 5 ? SpaceConversion(p, 1, Direction::ToRGB) : "";
    const size_t x = count - 3;
    p.out << Arg(p, 0) << " = " << function << "(float3 (" << Arg(p, x) << ", " << Arg(p, x + 1)
          << ", " << Arg(p, x + 2) << "));";
    if (!function.empty()) p.globals.features |= kFeatureUtil;
    return true;
}

bool ConvertTransformColor(OpConverterParams& p) {
    if (ArgCount(p) != 4) return false;
    const std::string from = SpaceConversion(p, 1, Direction::ToRGB);
    const std::string to = SpaceConversion(p, 2, Direction::FromRGB);
    p.out << Arg(p, 0) << " = " << to << "(" << from << "(" << Arg(p, 3) << "));";
    p.globals.features |= kFeatureUtil;
    return true;
}

} // namespace

void AddColorConverters(std::map<std::string, OpConverter>& c) {
    c["color"] = ConvertColor;
    c["transformc"] = ConvertTransformColor;
}

} // namespace oslo
