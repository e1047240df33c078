// Converters of the scene queries: getattribute over the per-object data the host predefines,
// the ray type, back-facing and surface area.
#include "op_converter_support.h"

namespace oslo {

namespace {

std::string Test(const char* attribute, const std::string& n) {
    return HashText(attribute) + " == " + n;
}

std::string PerObjectInt(const std::string& f, const std::string& n, const std::string& x) {
    return "else { int4 nameMask = ((int4)objectIntNames == (int4)" + n +
           "); if (any(nameMask)) {" + x + " = dot((int4)objectInts, nameMask); " + f +
           " = 1;} else {" + f + " = 0;} }";
}

bool ConvertGetAttribute(OpConverterParams& p) {
    if (ArgCount(p) != 3) return false;
    std::string attribute;
    const bool constantName = IsConstantString(p, 1, &attribute);
    const std::string f = Arg(p, 0), n = Arg(p, 1), x = Arg(p, 2);
    const auto unsupported = [&] {
        RecordUnsupported(p.info, "Unsupported attribute '" + (constantName ? attribute : n) +
                                      "' - conversion failed.");
        return false;
    };
    if (constantName && (attribute == "paLife" || attribute == "mtlID")) return unsupported();
    const OSOSymbol* destination = ArgSymbol(p, 2);
    if (!destination) return unsupported();
    const OSL::TypeSpec& type = destination->type;
    const std::string found = " " + f + " = 1; }";
    const std::string line = NewLine(p);
    if (type.is_color()) {
        p.out << "if(" << Test("wireColor", n) << ") { " << x << " = objectColor.rgb;" << found
              << line << "else { int4 nameMask = ((int4)objectColorNames == (int4)" << n
              << "); if (any(nameMask)) {" << x << " = mul(nameMask, objectColors).rgb; " << f
              << " = 1;} else {" << f << " = 0;} }";
        p.globals.features |=
            kFeatureObjectColor | kFeatureObjectColors | kFeatureNonConsolidatable;
    } else if (type.is_vectriple()) {
        const char* sets[] = {"UV1", "UV2", "UV3", "UV4"};
        for (int i = 0; i < 4; ++i)
            p.out << (i ? line + "else " : "") << "if(" << Test(sets[i], n) << ") { " << x
                  << " = state.tex_coord[osl_tex_coord_remap[" << i << "]];" << found;
        p.out << line << "else { " << f << " = 0; }";
        p.globals.additionalInputs.insert({"float4", "osl_tex_coord_remap"});
    } else if (type.is_int()) {
        p.out << "if(" << Test("nodeHandle", n) << ") { " << x << " = objectIds[0];" << found
              << line << "else if(" << Test("gBufID", n) << ") { " << x << " = objectIds[1];"
              << found << line << "else if(" << Test("osl:version", n) << ") { " << x << " = 11213;"
              << found << line << "else if(" << Test("renderer:version", n) << ") { " << x
              << " = 27000;" << found << line << PerObjectInt(f, n, x);
        p.globals.features |= kFeatureObjectIds | kFeatureObjectInts | kFeatureNonConsolidatable;
    } else if (type.is_string()) {
        p.out << "if(" << Test("nodeName", n) << ") { " << x << " = objectIds[2];" << found << line
              << "else if(" << Test("renderer:name", n) << ") { " << x << " = "
              << HashText("trelm:hlsl") << ";" << found << line << "else if("
              << Test("renderer:versionstring", n) << ") { " << x << " = "
              << HashText("TRELM_RELEASE") << ";" << found << line << PerObjectInt(f, n, x);
        p.globals.features |= kFeatureObjectIds | kFeatureObjectInts | kFeatureNonConsolidatable;
    } else if (type.is_float()) {
        p.out << "{ int4 nameMask = ((int4)objectColorNames == (int4)" << n
              << "); if (any(nameMask)) {" << x << " = dot(objectColors[0], nameMask); " << f
              << " = 1;} else {" << f << " = 0;} }";
        p.globals.features |= kFeatureObjectColors | kFeatureNonConsolidatable;
    } else {
        return unsupported();
    }
    return true;
}

bool ConvertRayType(OpConverterParams& p) {
    if (ArgCount(p) != 2) return false;
    p.out << Arg(p, 0) << " = ((ksg_matViewInverse[3].xyz == 0.0?" << HashText("reflection") << ":"
          << HashText("camera") << ") == " << Arg(p, 1) << ") ? 1 : 0;\n";
    return true;
}

} // namespace

void AddAttributeConverters(std::map<std::string, OpConverter>& c) {
    c["getattribute"] = ConvertGetAttribute;
    c["raytype"] = ConvertRayType;
    c["backfacing"] = [](OpConverterParams& p) {
        if (ArgCount(p) != 1) return false;
        p.out << Arg(p, 0) << " = (dot(state.normal, state.direction) > 0);";
        return true;
    };
    c["surfacearea"] = [](OpConverterParams& p) {
        if (ArgCount(p) != 1) return false;
        p.out << Arg(p, 0) << " = 0.0;";
        return true;
    };
}

} // namespace oslo
