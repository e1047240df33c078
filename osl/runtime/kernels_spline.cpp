// spline and splineinverse over every basis, float and colour knots, with derivatives.
#include "kernels_registry.h"
#include "spline_eval.h"

#include <string>

namespace OSL {

namespace {

// Operand layout: R, basis, x, [count], knots. iaux holds the basis when its name is a constant,
// else -1 (looked up while shading).
SplineBasis basisOf(const ExecState& st, const Instr& in) {
    return in.iaux >= 0 ? static_cast<SplineBasis>(in.iaux)
                        : splineBasisFromName(st.s(in.args[1])->string());
}

// The knot count to use, or -1 (after reporting why) when the spline cannot be evaluated.
int knotCount(ExecState& st, const Instr& in, const Operand& knots) {
    const int arraylen = std::max<int>(1, knots.arraylen);
    const int count = in.nargs == 5 ? st.integer(in.args[3]) : arraylen;
    if (count < kMinSplineKnots || count > arraylen) {
        const MasterOp& mop =
            st.prog->group->layers[size_t(in.layer)].master->ops[size_t(in.masterOp)];
        shaderError(st, in,
                    mop.opname.string() + " has " + std::to_string(count) +
                        " knots, it needs at least " + std::to_string(kMinSplineKnots) +
                        " and at most the array's " + std::to_string(arraylen) + " (" +
                        mop.sourcefile.string() + ":" + std::to_string(mop.line) + ")");
        return -1;
    }
    return count;
}

void zeroResult(ExecState& st, const Operand& R) {
    for (int c = 0; c < R.ncomp; ++c) st.store(R, c, Dual2<float>(0.0f));
}

void kSpline(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& K = in.args[in.nargs - 1];
    const int count = knotCount(st, in, K);
    if (count < 0) {
        zeroResult(st, R);
        return;
    }
    SplineKnots knots;
    knots.values = st.f(K);
    knots.count = count;
    knots.ncomp = K.ncomp;
    if (K.derivs) {
        knots.dx = knots.values + K.size / 4;
        knots.dy = knots.values + 2 * (K.size / 4);
    }
    Dual2<float> out[3];
    evalSpline(basisOf(st, in), st.dual(in.args[2], 0), knots, out);
    for (int c = 0; c < R.ncomp; ++c) st.store(R, c, out[c]);
}

void kSplineInverse(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& K = in.args[in.nargs - 1];
    const int count = knotCount(st, in, K);
    if (count < 0) {
        zeroResult(st, R);
        return;
    }
    st.store(R, 0, invertSpline(basisOf(st, in), st.dual(in.args[2], 0), st.f(K), count));
}

} // namespace

int selectSplineKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const bool inverse = op == "splineinverse";
    if (op != "spline" && !inverse) return 0;
    const int n = k.nargs();
    if (n != 4 && n != 5) return 0;
    const Operand& R = k.arg(0);
    const Operand& basis = k.arg(1);
    const Operand& x = k.arg(2);
    const Operand& knots = k.arg(n - 1);
    const bool knotsOk = knots.isFloat && knots.arraylen > 0 && !knots.isMatrix &&
                         (knots.ncomp == 1 || (!inverse && knots.ncomp == 3));
    if (!basis.isString || !(x.isFloat || x.isInt) || x.ncomp != 1 || !knotsOk || !R.isFloat ||
        R.arraylen != 0 || R.ncomp != knots.ncomp || (n == 5 && !k.arg(3).isInt))
        return k.fail(std::string(op) + ": unsupported argument types"), -1;
    k.in.iaux = -1;
    if (basis.isConst) {
        const ustring name =
            *reinterpret_cast<const ustring*>(k.prog.initImage.data() + basis.offset);
        k.in.iaux = static_cast<int>(splineBasisFromName(name.string()));
    }
    k.in.fn = inverse ? kSplineInverse : kSpline;
    return 1;
}

} // namespace OSL
