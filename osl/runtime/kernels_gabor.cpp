// Gabor noise, periodic and not, with its filtering and anisotropy options: the noise ops whose
// name argument is "gabor".
#include "gabor_noise.h"
#include "kernels_registry.h"

namespace OSL {

namespace {

// Where the parts of a gabor noise op live among its arguments.
struct GaborArgs {
    int dims = 0;         // 1, 2, 3 (a point) or 4 (a point and a time, the time ignored)
    int firstPeriod = -1; // periodic ops only
    int firstOption = 0;  // name/value pairs follow from here
};

bool isNumber(const Operand& o) {
    return (o.isFloat || o.isInt) && o.arraylen == 0 && !o.isMatrix;
}
bool isScalar(const Operand& o) {
    return isNumber(o) && o.ncomp == 1;
}
bool isTriple(const Operand& o) {
    return o.isFloat && o.arraylen == 0 && o.ncomp == 3;
}

// Reads the argument layout of noise/pnoise("gabor", ...): R, name, position, [periods],
// options. Returns false when the arguments fit none of the forms.
bool parseGaborArgs(const Operand* args, int nargs, bool periodic, GaborArgs& out) {
    if (nargs < 3) return false;
    auto scalarAt = [&](int i) { return i < nargs && isScalar(args[i]); };
    auto tripleAt = [&](int i) { return i < nargs && isTriple(args[i]); };
    int next = 2;
    if (tripleAt(2)) {
        const bool hasTime = periodic ? (scalarAt(3) && tripleAt(4) && scalarAt(5)) : scalarAt(3);
        out.dims = hasTime ? 4 : 3;
        next = hasTime ? 4 : 3;
        if (periodic) {
            if (!tripleAt(next)) return false;
            out.firstPeriod = next;
            next += hasTime ? 2 : 1;
        }
    } else if (scalarAt(2)) {
        const bool two = periodic ? (scalarAt(3) && scalarAt(4) && scalarAt(5)) : scalarAt(3);
        out.dims = two ? 2 : 1;
        next = 2 + out.dims;
        if (periodic) {
            if (!scalarAt(next)) return false;
            out.firstPeriod = next;
            next += out.dims;
        }
    } else {
        return false;
    }
    if ((nargs - next) % 2 != 0) return false;
    for (int i = next; i < nargs; i += 2)
        if (!args[i].isString) return false;
    out.firstOption = next;
    return true;
}

bool isPeriodicOp(ustring op) {
    return op == "pnoise" || op == "psnoise";
}

void readOptions(const ExecState& st, const Instr& in, int first, GaborOptions& opt) {
    static const ustring kAnisotropic("anisotropic"), kDoFilter("do_filter"),
        kDirection("direction"), kBandwidth("bandwidth"), kImpulses("impulses");
    for (int i = first; i + 1 < in.nargs; i += 2) {
        const ustring name = *st.s(in.args[i]);
        const Operand& v = in.args[i + 1];
        if (name == kAnisotropic && isNumber(v))
            opt.anisotropic = st.integer(v);
        else if (name == kDoFilter && isNumber(v))
            opt.doFilter = st.integer(v) != 0;
        else if (name == kDirection && isTriple(v))
            opt.direction = st.vec(v);
        else if (name == kBandwidth && isNumber(v))
            opt.bandwidth = st.scalar(v);
        else if (name == kImpulses && isNumber(v))
            opt.impulses = st.scalar(v);
    }
}

void kGaborNoise(ExecState& st, const Instr& in) {
    execGaborNoise(st, in);
}

} // namespace

void execGaborNoise(ExecState& st, const Instr& in) {
    const MasterOp& mop = st.prog->group->layers[size_t(in.layer)].master->ops[size_t(in.masterOp)];
    const bool periodic = isPeriodicOp(mop.opname);
    const Operand& R = in.args[0];
    GaborArgs layout;
    if (!parseGaborArgs(in.args, in.nargs, periodic, layout) || !R.isFloat) {
        shaderError(st, in, "noise(\"gabor\", ...) called with arguments it does not accept");
        return;
    }
    GaborOptions opt;
    readOptions(st, in, layout.firstOption, opt);

    Dual2<Vec3> p(Vec3(0.0f));
    Vec3 period(0.0f);
    const Operand& P = in.args[2];
    if (layout.dims >= 3) {
        p = st.dvec(P);
        if (periodic) period = st.vec(in.args[layout.firstPeriod]);
    } else {
        for (int d = 0; d < layout.dims; ++d) {
            const Dual2<float> x = st.dual(in.args[2 + d], 0);
            p.val()[d] = x.val();
            p.dx()[d] = x.dx();
            p.dy()[d] = x.dy();
            if (periodic) period[d] = st.scalar(in.args[layout.firstPeriod + d]);
        }
    }
    const int channels = R.ncomp == 3 ? 3 : 1;
    Dual2<float> result[3];
    gaborNoise(p, periodic ? &period : nullptr, opt, channels, result);
    for (int c = 0; c < channels; ++c) st.store(R, c, result[c]);
}

int selectGaborKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    if (op != "noise" && op != "snoise" && op != "pnoise" && op != "psnoise") return 0;
    if (k.nargs() < 3 || !k.arg(1).isString || !k.arg(1).isConst) return 0;
    const ustring name =
        *reinterpret_cast<const ustring*>(k.prog.initImage.data() + k.arg(1).offset);
    if (name != "gabor") return 0;
    const Operand& R = k.arg(0);
    GaborArgs layout;
    if (!R.isFloat || (R.ncomp != 1 && R.ncomp != 3) || R.arraylen != 0 ||
        !parseGaborArgs(k.in.args, k.nargs(), isPeriodicOp(k.op), layout))
        return k.fail(k.op.string() + "(\"gabor\", ...): unsupported argument types"), -1;
    // Option names are nearly always constants; an unknown one is reported once, here.
    for (int i = layout.firstOption; i < k.nargs(); i += 2) {
        if (!k.arg(i).isConst) continue;
        const ustring opt =
            *reinterpret_cast<const ustring*>(k.prog.initImage.data() + k.arg(i).offset);
        if (opt != "anisotropic" && opt != "do_filter" && opt != "direction" &&
            opt != "bandwidth" && opt != "impulses")
            k.sys.warning("Unknown gabor noise option \"" + opt.string() + "\" is ignored");
    }
    k.in.fn = kGaborNoise;
    return 1;
}

} // namespace OSL
