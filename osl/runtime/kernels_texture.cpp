// Texture lookups through the renderer services: texture, texture3d, environment and
// gettextureinfo. A constant file name is resolved to a texture handle once, when the program
// is built; every lookup asks for four channels, so that "alpha" is the channel after the result.
#include "kernels_registry.h"
#include "shader_master.h"
#include "texture_options.h"

#include <OSL/rendererservices.h>

#include <OpenImageIO/texture.h>

namespace OSL {

namespace {

using TextureHandle = RendererServices::TextureHandle;

// Instr::iaux of a lookup: the index of its first optional argument, plus this bit when the
// shader passed the derivatives of its coordinates explicitly.
constexpr int kUserDerivs = 1 << 16;
constexpr int kFirstMask = kUserDerivs - 1;

TextureHandle* handleOf(const Instr& in) {
    return static_cast<TextureHandle*>(const_cast<void*>(in.aux));
}

RendererServices& renderer(const ExecState& st) {
    return *st.ctx->system->renderer;
}

// Copies a four-channel lookup into the result (nchans channels) and the alpha output (the
// channel after them), with d/dx and d/dy when the destinations carry derivatives.
void storeLookup(const ExecState& st, const Operand& R, const TextureOptionOutputs& out,
                 const float* res, const float* dx, const float* dy) {
    const int n = R.ncomp;
    for (int c = 0; c < n; ++c)
        st.store(R, c, Dual2<float>(res[c], dx ? dx[c] : 0.0f, dy ? dy[c] : 0.0f));
    if (out.alpha)
        st.store(*out.alpha, 0, Dual2<float>(res[n], dx ? dx[n] : 0.0f, dy ? dy[n] : 0.0f));
}

// A lookup that works clears the message to the same empty string that "" is in a shader.
const ustring kEmpty("");

void finishError(const ExecState& st, const TextureOptionOutputs& out, bool ok, ustring err) {
    if (out.errormessage) *st.s(*out.errormessage) = ok ? kEmpty : err;
}

void kTexture(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const ustring filename = *st.s(in.args[1]);
    const Dual2<float> s = st.dual(in.args[2], 0);
    const Dual2<float> t = st.dual(in.args[3], 0);
    const bool userDerivs = in.iaux & kUserDerivs;
    const float dsdx = userDerivs ? st.scalar(in.args[4]) : s.dx();
    const float dtdx = userDerivs ? st.scalar(in.args[5]) : t.dx();
    const float dsdy = userDerivs ? st.scalar(in.args[6]) : s.dy();
    const float dtdy = userDerivs ? st.scalar(in.args[7]) : t.dy();

    TextureOpt opt;
    TextureOptionOutputs out;
    applyTextureOptions(st, in, in.iaux & kFirstMask, false, R.ncomp, opt, out);
    const bool derivs = R.derivs || (out.alpha && out.alpha->derivs);

    float res[4] = {0, 0, 0, 0}, drds[4] = {0, 0, 0, 0}, drdt[4] = {0, 0, 0, 0};
    ustring err;
    const bool ok = renderer(st).texture(
        filename, handleOf(in), nullptr, opt, st.sg, s.val(), t.val(), dsdx, dtdx, dsdy, dtdy, 4,
        res, derivs ? drds : nullptr, derivs ? drdt : nullptr, out.errormessage ? &err : nullptr);
    if (derivs) {
        // The texture system's gradients are along s and t; the chain rule turns them into
        // screen-space derivatives.
        float dx[4], dy[4];
        for (int c = 0; c < 4; ++c) {
            dx[c] = drds[c] * dsdx + drdt[c] * dtdx;
            dy[c] = drds[c] * dsdy + drdt[c] * dtdy;
        }
        storeLookup(st, R, out, res, dx, dy);
    } else {
        storeLookup(st, R, out, res, nullptr, nullptr);
    }
    finishError(st, out, ok, err);
}

// The global P is the only position whose derivative along z is known.
bool isGlobalP(const ExecState& st, const Operand& o) {
    for (const GlobalSlot& g : st.prog->globals)
        if (g.id == GlobalId::P) return g.offset == o.offset;
    return false;
}

void kTexture3d(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const ustring filename = *st.s(in.args[1]);
    const Operand& P = in.args[2];
    const bool userDerivs = in.iaux & kUserDerivs;
    const Dual2<Vec3> p = st.dvec(P);
    const Vec3 dPdx = userDerivs ? st.vec(in.args[3]) : p.dx();
    const Vec3 dPdy = userDerivs ? st.vec(in.args[4]) : p.dy();
    const Vec3 dPdz =
        userDerivs ? st.vec(in.args[5]) : (isGlobalP(st, P) ? st.sg->dPdz : Vec3(0.0f, 0.0f, 0.0f));

    TextureOpt opt;
    TextureOptionOutputs out;
    applyTextureOptions(st, in, in.iaux & kFirstMask, true, R.ncomp, opt, out);
    const bool derivs = R.derivs || (out.alpha && out.alpha->derivs);

    float res[4] = {0, 0, 0, 0};
    float drds[4] = {0, 0, 0, 0}, drdt[4] = {0, 0, 0, 0}, drdr[4] = {0, 0, 0, 0};
    ustring err;
    const bool ok =
        renderer(st).texture3d(filename, handleOf(in), nullptr, opt, st.sg, p.val(), dPdx, dPdy,
                               dPdz, 4, res, derivs ? drds : nullptr, derivs ? drdt : nullptr,
                               derivs ? drdr : nullptr, out.errormessage ? &err : nullptr);
    if (derivs) {
        float dx[4], dy[4];
        for (int c = 0; c < 4; ++c) {
            dx[c] = drds[c] * dPdx.x + drdt[c] * dPdx.y + drdr[c] * dPdx.z;
            dy[c] = drds[c] * dPdy.x + drdt[c] * dPdy.y + drdr[c] * dPdy.z;
        }
        storeLookup(st, R, out, res, dx, dy);
    } else {
        storeLookup(st, R, out, res, nullptr, nullptr);
    }
    finishError(st, out, ok, err);
}

// Environment lookups return no derivatives: the texture system's gradients are in the
// map's own st space, whose relation to the direction depends on the map's projection.
void kEnvironment(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const ustring filename = *st.s(in.args[1]);
    const bool userDerivs = in.iaux & kUserDerivs;
    const Dual2<Vec3> dir = st.dvec(in.args[2]);
    const Vec3 dRdx = userDerivs ? st.vec(in.args[3]) : dir.dx();
    const Vec3 dRdy = userDerivs ? st.vec(in.args[4]) : dir.dy();

    TextureOpt opt;
    TextureOptionOutputs out;
    applyTextureOptions(st, in, in.iaux & kFirstMask, false, R.ncomp, opt, out);

    float res[4] = {0, 0, 0, 0};
    ustring err;
    const bool ok =
        renderer(st).environment(filename, handleOf(in), nullptr, opt, st.sg, dir.val(), dRdx, dRdy,
                                 4, res, nullptr, nullptr, out.errormessage ? &err : nullptr);
    storeLookup(st, R, out, res, nullptr, nullptr);
    finishError(st, out, ok, err);
}

// The data type the texture system is asked for: base type, aggregate and array length of the
// destination, without its vector semantics.
TypeDesc infoType(const Operand& o) {
    TypeDesc t = o.type;
    return TypeDesc(TypeDesc::BASETYPE(t.basetype), TypeDesc::AGGREGATE(t.aggregate), t.arraylen);
}

template <bool ST>
void kGetTextureInfo(ExecState& st, const Instr& in) {
    const ustring filename = *st.s(in.args[1]);
    const int nameArg = ST ? 4 : 2;
    const ustring dataname = *st.s(in.args[nameArg]);
    const Operand& D = in.args[nameArg + 1];
    RendererServices& rs = renderer(st);
    bool ok;
    if constexpr (ST)
        ok = rs.get_texture_info(filename, handleOf(in), st.scalar(in.args[2]),
                                 st.scalar(in.args[3]), nullptr, st.ctx, 0, dataname, infoType(D),
                                 st.p(D), nullptr);
    else
        ok = rs.get_texture_info(filename, handleOf(in), nullptr, st.ctx, 0, dataname, infoType(D),
                                 st.p(D), nullptr);
    if (ok) st.zeroDerivs(D);
    *st.i(in.args[0]) = ok ? 1 : 0;
}

// A handle for a constant file name that the texture system can open; null otherwise, and
// the lookups then go by name.
void chooseHandle(KernelChoice& k) {
    const Operand& name = k.arg(1);
    if (!name.isConst || !name.isString) return;
    const ustring filename =
        *reinterpret_cast<const ustring*>(k.prog.initImage.data() + name.offset);
    RendererServices* rs = k.sys.renderer;
    if (!rs) return;
    TextureHandle* h = rs->get_texture_handle(filename, nullptr);
    if (h && rs->good(h)) k.in.aux = h;
}

std::string sourceOf(const KernelChoice& k) {
    const ShaderInstance& inst = k.prog.group->layers[size_t(k.in.layer)];
    const MasterOp& op = inst.master->ops[size_t(k.in.masterOp)];
    return "(" + op.sourcefile.string() + ":" + std::to_string(op.line) + ")";
}

bool isTripleArg(const KernelChoice& k, int a) {
    return a < k.nargs() && k.arg(a).isFloat && k.arg(a).ncomp == 3 && k.arg(a).arraylen == 0;
}
bool isFloatArg(const KernelChoice& k, int a) {
    return a < k.nargs() && (k.arg(a).isFloat || k.arg(a).isInt) && k.arg(a).ncomp == 1 &&
           k.arg(a).arraylen == 0;
}

// Sets the first optional argument, reports the unknown ones (the lookup goes on without
// them) and checks the result.
int selectLookup(KernelChoice& k, Kernel fn, int first, bool userDerivs, bool is3d) {
    const Operand& R = k.arg(0);
    if (!R.isFloat || R.arraylen != 0 || (R.ncomp != 1 && R.ncomp != 3))
        return k.fail(k.op.string() + " returns a float or a color"), -1;
    if (!k.arg(1).isString) return k.fail(k.op.string() + " needs a file name"), -1;
    const std::string report = checkTextureOptions(k.prog, k.in, first, is3d, sourceOf(k));
    if (!report.empty()) k.sys.error(report.substr(0, report.size() - 1));
    k.in.fn = fn;
    k.in.iaux = first | (userDerivs ? kUserDerivs : 0);
    chooseHandle(k);
    return 1;
}

} // namespace

int selectTextureKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const int n = k.nargs();
    if (op == "texture") {
        if (n < 4 || !isFloatArg(k, 2) || !isFloatArg(k, 3))
            return k.fail("texture needs a file name and s, t coordinates"), -1;
        const bool user = n > 4 && !k.arg(4).isString;
        if (user && (n < 8 || !isFloatArg(k, 4) || !isFloatArg(k, 5) || !isFloatArg(k, 6) ||
                     !isFloatArg(k, 7)))
            return k.fail("texture: the derivatives of s and t are four floats"), -1;
        return selectLookup(k, kTexture, user ? 8 : 4, user, false);
    }
    if (op == "texture3d") {
        if (n < 3 || !isTripleArg(k, 2)) return k.fail("texture3d needs a point"), -1;
        const bool user = n > 3 && !k.arg(3).isString;
        if (user && (!isTripleArg(k, 3) || !isTripleArg(k, 4) || !isTripleArg(k, 5)))
            return k.fail("texture3d: the derivatives of the point are three vectors"), -1;
        return selectLookup(k, kTexture3d, user ? 6 : 3, user, true);
    }
    if (op == "environment") {
        if (n < 3 || !isTripleArg(k, 2)) return k.fail("environment needs a direction"), -1;
        const bool user = n > 3 && !k.arg(3).isString;
        if (user && (!isTripleArg(k, 3) || !isTripleArg(k, 4)))
            return k.fail("environment: the derivatives of the direction are two vectors"), -1;
        return selectLookup(k, kEnvironment, user ? 5 : 3, user, false);
    }
    if (op == "gettextureinfo") {
        const bool st = n == 6;
        if ((n != 4 && n != 6) || !k.arg(0).isInt || !k.arg(1).isString ||
            !k.arg(st ? 4 : 2).isString || (st && (!isFloatArg(k, 2) || !isFloatArg(k, 3))))
            return k.fail("gettextureinfo: unexpected arguments"), -1;
        k.in.fn = st ? kGetTextureInfo<true> : kGetTextureInfo<false>;
        chooseHandle(k);
        return 1;
    }
    return 0;
}

} // namespace OSL
