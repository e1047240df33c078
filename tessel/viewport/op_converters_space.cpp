// Converters of matrices and coordinate-space transforms. Space names are strings, hence
// integers in the viewport, so each op compares its space argument with the hashes of the
// spaces the host has matrices for.
#include "op_converter_support.h"

namespace oslo {

namespace {

// Code that depends on "object" space (or on a space only known at run time) depends on the
// object and must not be shared between objects.
void MarkObjectDependence(OpConverterParams& p, size_t spaceArg) {
    std::string space;
    if (!IsConstantString(p, spaceArg, &space) || space == "object")
        p.globals.features |= kFeatureNonConsolidatable;
}

// "if(H == to) {" or "else if(H == to) {" on its own line.
std::string SpaceTest(OpConverterParams& p, bool first, const char* space, const std::string& to) {
    return std::string(first ? "" : NewLine(p) + "else ") + "if(" + HashText(space) + " == " + to +
           ") {";
}

bool ConvertMatrix(OpConverterParams& p) {
    if (ArgCount(p) == 17) {
        p.out << Arg(p, 0) << " = float4x4(";
        for (size_t i = 1; i < 17; ++i) p.out << (i > 1 ? ", " : "") << Arg(p, i);
        p.out << ");";
        return true;
    }
    if (ArgCount(p) != 3) return false;
    const std::string r = Arg(p, 0), to = Arg(p, 2);
    p.out << SpaceTest(p, true, "object", to) << r << " = ksg_matWorldInverse;}"
          << SpaceTest(p, false, "camera", to) << r << " = ksg_matView;}"
          << SpaceTest(p, false, "screen", to) << r << " = ksg_matViewProj;} "
          << SpaceTest(p, false, "NDC", to) << r << " = ksg_matViewProj;} "
          << SpaceTest(p, false, "raster", to) << r << " = ksg_matViewProj;}";
    MarkObjectDependence(p, 2);
    RecordUnsupported(p.info, "'matrix(string, string)' only implemented for object space.");
    return true;
}

bool ConvertGetMatrix(OpConverterParams& p) {
    if (ArgCount(p) != 4) return false;
    const std::string f = Arg(p, 0), to = Arg(p, 2), m = Arg(p, 3);
    p.out << SpaceTest(p, true, "object", to) << m << " = ksg_matWorldInverse; " << f << " = 1; }"
          << SpaceTest(p, false, "camera", to) << m << " = ksg_matView; " << f << " = 1; }"
          << SpaceTest(p, false, "screen", to) << m << " = ksg_matViewProj; " << f << " = 1; }"
          << SpaceTest(p, false, "NDC", to) << f << " = 0; }" << SpaceTest(p, false, "raster", to)
          << f << " = 0; }";
    MarkObjectDependence(p, 2);
    RecordUnsupported(p.info,
                      "'getmatrix(string, string, matrix)' only implemented for object space.");
    return true;
}

// transform(result, from, to, point); the from-space is not used.
void TransformPointToSpace(OpConverterParams& p, size_t toArg, size_t pointArg) {
    const std::string r = Arg(p, 0), to = Arg(p, toArg);
    const std::string screen =
        " float4 screenpos_xyzw_tmp = mul(float4(" + r + ", 1.f), ksg_matViewProj); ";
    const std::string projected = "(screenpos_xyzw_tmp.xyz / screenpos_xyzw_tmp.w)";
    const std::string ndc = projected + " * float3(0.5f,-0.5f,1.f) + float3(0.5f,0.5f,0.f)";
    p.out << r << " = " << Arg(p, pointArg) << ";" << SpaceTest(p, true, "object", to) << r
          << " = mul(float4(" << r << ", 1.f), ksg_matWorldInverse).xyz;}"
          << SpaceTest(p, false, "camera", to) << r << " = mul(float4(" << r
          << ", 1.f), ksg_matView).xyz;}" << SpaceTest(p, false, "screen", to) << screen << r
          << " = screenpos_xyzw_tmp.xyz / screenpos_xyzw_tmp.w; }" << SpaceTest(p, false, "NDC", to)
          << screen << r << " = " << ndc << "; }" << SpaceTest(p, false, "raster", to) << screen
          << r << " = (" << ndc << ") * float3(__image_x_resolution, __image_y_resolution, 1.f); }";
    MarkObjectDependence(p, toArg);
}

bool ConvertTransform(OpConverterParams& p) {
    if (ArgCount(p) == 4) {
        TransformPointToSpace(p, 2, 3);
        return true;
    }
    if (ArgCount(p) != 3) return false;
    // transform(to, point) names a space instead of a matrix.
    if (ArgSymbol(p, 1) && ArgSymbol(p, 1)->type.is_string()) {
        TransformPointToSpace(p, 1, 2);
        return true;
    }
    p.out << "{ float4 transform_xyzw_tmp = mul( float4(" << Arg(p, 2) << ", 1.f), " << Arg(p, 1)
          << "); " << Arg(p, 0) << " = transform_xyzw_tmp.xyz / transform_xyzw_tmp.w; }";
    return true;
}

void TransformVectorToSpace(OpConverterParams& p, size_t toArg, size_t vectorArg) {
    const std::string r = Arg(p, 0), to = Arg(p, toArg);
    p.out << r << " = " << Arg(p, vectorArg) << ";" << SpaceTest(p, true, "object", to) << r
          << " = mul(" << r << ", (float3x3)ksg_matWorldInverse);}"
          << SpaceTest(p, false, "camera", to) << r << " = mul(" << r
          << ", (float3x3)ksg_matView);}";
    MarkObjectDependence(p, toArg);
}

// Normals are transformed like vectors.
bool ConvertTransformVector(OpConverterParams& p) {
    if (ArgCount(p) == 4) {
        TransformVectorToSpace(p, 2, 3);
        return true;
    }
    if (ArgCount(p) != 3) return false;
    if (ArgSymbol(p, 1) && ArgSymbol(p, 1)->type.is_string()) {
        TransformVectorToSpace(p, 1, 2);
        return true;
    }
    p.out << Arg(p, 0) << " = mul(" << Arg(p, 2) << ", (float3x3)" << Arg(p, 1) << ");";
    return true;
}

} // namespace

void AddSpaceConverters(std::map<std::string, OpConverter>& c) {
    c["matrix"] = ConvertMatrix;
    c["getmatrix"] = ConvertGetMatrix;
    c["transform"] = ConvertTransform;
    c["transformv"] = ConvertTransformVector;
    c["transformn"] = ConvertTransformVector;
}

} // namespace oslo
