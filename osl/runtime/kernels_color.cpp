// Colour science: blackbody, wavelength_color, luminance, transformc and colour-space construction.
// Each kernel works in the colour system the "colorspace" attribute named when the group was built.
#include "color_system.h"
#include "kernels_registry.h"

namespace OSL {

namespace {

const ColorSystem& systemOf(const Instr& in) {
    return *static_cast<const ColorSystem*>(in.aux);
}

std::string unknownTransform(ustring from, ustring to) {
    return "Unknown color space transformation \"" + from.string() + "\" -> \"" + to.string() +
           "\"";
}

// Converts through the external colour configuration; reports and keeps the colour when the
// configuration does not know the spaces.
template <class C>
C externalTransform(ExecState& st, const Instr& in, ustring from, ustring to, const C& c) {
    OIIO::ColorProcessorHandle p = ExternalColorTransforms::instance().find(from, to);
    if (p) return ExternalColorTransforms::apply(*p, c);
    shaderError(st, in, unknownTransform(from, to));
    return c;
}

// color(space, a, b, c): the three values are taken in the named space. Like the reference, the
// result carries no derivatives.
void kColorFromSpace(ExecState& st, const Instr& in) {
    const ustring space = *st.s(in.args[1]);
    const Vec3 c(st.comp(in.args[2], 0), st.comp(in.args[3], 0), st.comp(in.args[4], 0));
    Vec3 rgb;
    if (!systemOf(in).toRgb(space, c, rgb))
        rgb = externalTransform(st, in, space, ustring("RGB"), c);
    st.storeVec(in.args[0], rgb);
}

void kTransformc(ExecState& st, const Instr& in) {
    static const ustring rgbName("rgb");
    const Operand& R = in.args[0];
    const Operand& C = in.args[in.nargs - 1];
    const ustring from = in.nargs == 4 ? *st.s(in.args[1]) : rgbName;
    const ustring to = *st.s(in.args[in.nargs - 2]);
    const ColorSystem& cs = systemOf(in);
    if (R.derivs && C.derivs) {
        const DColor c = st.dvec(C);
        DColor out;
        if (!cs.transform(from, to, c, out)) out = externalTransform(st, in, from, to, c);
        st.storeVec(R, out);
        return;
    }
    const Vec3 c = st.vec(C);
    Vec3 out;
    if (!cs.transform(from, to, c, out)) out = externalTransform(st, in, from, to, c);
    st.storeVec(R, out);
}

// transformc between two spellings of the same space, both fixed when the group was built:
// the colour passes unchanged, as the reference's constant folding leaves it. (A round trip
// through RGB could move it, e.g. a hue of 1 comes back as 0.)
void kTransformcIdentity(ExecState& st, const Instr& in) {
    st.storeVec(in.args[0], st.dvec(in.args[in.nargs - 1]));
}

void kLuminance(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const ColorSystem& cs = systemOf(in);
    if (R.derivs)
        st.store(R, 0, cs.luminance(st.dvec(in.args[1])));
    else
        *st.f(R) = cs.luminance(st.vec(in.args[1]));
}

void kBlackbody(ExecState& st, const Instr& in) {
    st.storeVec(in.args[0], systemOf(in).blackbody(st.scalar(in.args[1])));
}

void kWavelengthColor(ExecState& st, const Instr& in) {
    st.storeVec(in.args[0], systemOf(in).wavelengthColor(st.scalar(in.args[1])));
}

// Whether a transformc's spaces are constants naming the same space, counting every name of
// the system's RGB as one.
bool sameFixedSpaces(const KernelChoice& k, int n) {
    const ColorSystem& cs = ColorSystem::findOrDefault(k.sys.colorspace);
    auto fixedSpace = [&](const Operand& o, ustring& space) {
        if (!o.isString || !o.isConst) return false;
        space = *reinterpret_cast<const ustring*>(k.prog.initImage.data() + o.offset);
        if (cs.isRgbName(space)) space = ustring("rgb");
        return true;
    };
    ustring from("rgb"), to;
    if (n == 4 && !fixedSpace(k.arg(1), from)) return false;
    return fixedSpace(k.arg(n - 2), to) && from == to;
}

} // namespace

int selectColorKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const int n = k.nargs();
    Kernel fn = nullptr;
    if (op == "color" && n == 5 && k.arg(1).isString)
        fn = kColorFromSpace;
    else if (op == "transformc" && (n == 3 || n == 4))
        fn = sameFixedSpaces(k, n) ? kTransformcIdentity : kTransformc;
    else if (op == "luminance" && n == 2)
        fn = kLuminance;
    else if (op == "blackbody" && n == 2)
        fn = kBlackbody;
    else if (op == "wavelength_color" && n == 2)
        fn = kWavelengthColor;
    if (!fn) return 0;
    k.in.fn = fn;
    k.in.aux = &ColorSystem::findOrDefault(k.sys.colorspace);
    return 1;
}

} // namespace OSL
