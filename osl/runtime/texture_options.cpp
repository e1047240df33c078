// The optional arguments of texture lookups, read from the op's operands on each call: names
// compare as interned strings, so a call costs a few pointer comparisons per pair.
#include "texture_options.h"

#include "shader_group.h"
#include "shader_master.h"
#include "shading_context.h"
#include "shading_system_impl.h"

#include <algorithm>

namespace OSL {

namespace {

const ustring kWidth("width"), kSWidth("swidth"), kTWidth("twidth"), kRWidth("rwidth");
const ustring kBlur("blur"), kSBlur("sblur"), kTBlur("tblur"), kRBlur("rblur");
const ustring kWrap("wrap"), kSWrap("swrap"), kTWrap("twrap"), kRWrap("rwrap");
const ustring kFill("fill"), kTime("time"), kFirstChannel("firstchannel"), kSubimage("subimage");
const ustring kInterp("interp"), kAlpha("alpha"), kErrorMessage("errormessage");
const ustring kMissingColor("missingcolor"), kMissingAlpha("missingalpha");
const ustring kSmartCubic("smartcubic"), kCubic("cubic"), kLinear("linear"), kClosest("closest");

bool isScalar(const Operand& v) {
    return v.arraylen == 0 && v.ncomp == 1 && (v.isFloat || v.isInt);
}
bool isFloatScalar(const Operand& v) {
    return v.arraylen == 0 && v.ncomp == 1 && v.isFloat;
}
bool isIntScalar(const Operand& v) {
    return v.arraylen == 0 && v.isInt;
}
bool isString(const Operand& v) {
    return v.arraylen == 0 && v.isString;
}
bool isTriple(const Operand& v) {
    return v.arraylen == 0 && v.isFloat && v.ncomp == 3;
}

} // namespace

TextureOption classifyTextureOption(ustring name, const Operand& v) {
    if (name.empty()) return TextureOption::Skip;
    struct Numeric {
        const ustring* name;
        TextureOption option;
    };
    static const Numeric numeric[] = {
        {&kWidth, TextureOption::Width},   {&kSWidth, TextureOption::SWidth},
        {&kTWidth, TextureOption::TWidth}, {&kRWidth, TextureOption::RWidth},
        {&kBlur, TextureOption::Blur},     {&kSBlur, TextureOption::SBlur},
        {&kTBlur, TextureOption::TBlur},   {&kRBlur, TextureOption::RBlur},
        {&kFill, TextureOption::Fill},     {&kTime, TextureOption::Time}};
    for (const Numeric& n : numeric)
        if (name == *n.name) return isScalar(v) ? n.option : TextureOption::Unknown;
    if (name == kWrap) return isString(v) ? TextureOption::Wrap : TextureOption::Unknown;
    if (name == kSWrap) return isString(v) ? TextureOption::SWrap : TextureOption::Unknown;
    if (name == kTWrap) return isString(v) ? TextureOption::TWrap : TextureOption::Unknown;
    if (name == kRWrap) return isString(v) ? TextureOption::RWrap : TextureOption::Unknown;
    if (name == kFirstChannel)
        return isIntScalar(v) ? TextureOption::FirstChannel : TextureOption::Unknown;
    if (name == kSubimage) {
        if (isIntScalar(v)) return TextureOption::Subimage;
        return isString(v) ? TextureOption::SubimageName : TextureOption::Unknown;
    }
    if (name == kInterp) return isString(v) ? TextureOption::Interp : TextureOption::Unknown;
    if (name == kAlpha) return isFloatScalar(v) ? TextureOption::Alpha : TextureOption::Unknown;
    if (name == kErrorMessage)
        return isString(v) ? TextureOption::ErrorMessage : TextureOption::Unknown;
    if (name == kMissingColor)
        return isTriple(v) ? TextureOption::MissingColor : TextureOption::Unknown;
    if (name == kMissingAlpha)
        return isFloatScalar(v) ? TextureOption::MissingAlpha : TextureOption::Unknown;
    return TextureOption::Unknown;
}

int decodeTextureInterp(ustring name) {
    if (name == kSmartCubic) return TextureOpt::InterpSmartBicubic;
    if (name == kCubic) return TextureOpt::InterpBicubic;
    if (name == kLinear) return TextureOpt::InterpBilinear;
    if (name == kClosest) return TextureOpt::InterpClosest;
    return -1;
}

void applyTextureOptions(const ExecState& st, const Instr& in, int first, bool is3d, int nchans,
                         TextureOpt& opt, TextureOptionOutputs& out) {
    bool colorGiven = false, missingGiven = false;
    for (int a = first; a + 1 < in.nargs; a += 2) {
        const Operand& nameOp = in.args[a];
        if (!nameOp.isString) continue;
        const Operand& v = in.args[a + 1];
        switch (classifyTextureOption(*st.s(nameOp), v)) {
        case TextureOption::Width:
            opt.swidth = opt.twidth = st.scalar(v);
            if (is3d) opt.rwidth = opt.swidth;
            break;
        case TextureOption::SWidth:
            opt.swidth = st.scalar(v);
            break;
        case TextureOption::TWidth:
            opt.twidth = st.scalar(v);
            break;
        case TextureOption::RWidth:
            opt.rwidth = st.scalar(v);
            break;
        case TextureOption::Blur:
            opt.sblur = opt.tblur = st.scalar(v);
            if (is3d) opt.rblur = opt.sblur;
            break;
        case TextureOption::SBlur:
            opt.sblur = st.scalar(v);
            break;
        case TextureOption::TBlur:
            opt.tblur = st.scalar(v);
            break;
        case TextureOption::RBlur:
            opt.rblur = st.scalar(v);
            break;
        case TextureOption::Wrap:
            opt.swrap = opt.twrap = TextureOpt::decode_wrapmode(*st.s(v));
            if (is3d) opt.rwrap = opt.swrap;
            break;
        case TextureOption::SWrap:
            opt.swrap = TextureOpt::decode_wrapmode(*st.s(v));
            break;
        case TextureOption::TWrap:
            opt.twrap = TextureOpt::decode_wrapmode(*st.s(v));
            break;
        case TextureOption::RWrap:
            opt.rwrap = TextureOpt::decode_wrapmode(*st.s(v));
            break;
        case TextureOption::Fill:
            opt.fill = st.scalar(v);
            break;
        case TextureOption::Time:
            opt.time = st.scalar(v);
            break;
        case TextureOption::FirstChannel:
            opt.firstchannel = *st.i(v);
            break;
        case TextureOption::Subimage:
            opt.subimage = *st.i(v);
            break;
        case TextureOption::SubimageName:
            opt.subimagename = *st.s(v);
            break;
        case TextureOption::Interp: {
            const int code = decodeTextureInterp(*st.s(v));
            if (code >= 0) opt.interpmode = TextureOpt::InterpMode(code);
            break;
        }
        case TextureOption::Alpha:
            out.alpha = &v;
            break;
        case TextureOption::ErrorMessage:
            out.errormessage = &v;
            break;
        case TextureOption::MissingColor: {
            const float* c = st.f(v);
            std::copy(c, c + 3, out.missingcolor);
            colorGiven = missingGiven = true;
            break;
        }
        case TextureOption::MissingAlpha:
            out.missingcolor[std::clamp(nchans, 0, 3)] = st.scalar(v);
            missingGiven = true;
            break;
        case TextureOption::Skip:
        case TextureOption::Unknown:
            break;
        }
    }
    if (!missingGiven) return;
    // A missing alpha alone leaves the colour of a missing texture at the fill value.
    if (!colorGiven)
        for (int c = 0; c < std::min(nchans, 3); ++c) out.missingcolor[c] = opt.fill;
    opt.missingcolor = out.missingcolor;
}

std::string checkTextureOptions(const Program& prog, const Instr& in, int first, bool is3d,
                                const std::string& where) {
    std::string report;
    for (int a = first; a < in.nargs; a += 2) {
        const Operand& nameOp = in.args[a];
        if (!nameOp.isString || a + 1 >= in.nargs) {
            report += std::string("Malformed optional arguments of texture") + (is3d ? "3d" : "") +
                      " " + where + "\n";
            break;
        }
        if (!nameOp.isConst) continue;
        const ustring name =
            *reinterpret_cast<const ustring*>(prog.initImage.data() + nameOp.offset);
        const Operand& v = in.args[a + 1];
        if (classifyTextureOption(name, v) != TextureOption::Unknown) continue;
        TypeDesc t = v.type;
        report += std::string("Unknown texture") + (is3d ? "3d" : "") + " optional argument: \"" +
                  name.string() + "\", <" + t.c_str() + "> " + where + "\n";
    }
    return report;
}

} // namespace OSL
