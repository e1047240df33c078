// Data movement: assignment with conversions, components, array elements, matrix entries,
// type constructors, coordinate-system transforms and derivative queries.
#include "kernels_registry.h"
#include "transforms.h"

#include <OSL/dual.h>

#include <cmath>

namespace OSL {

namespace {

using D2 = Dual2<float>;

// ---- assignment -------------------------------------------------------------------------------

void kCopy(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& A = in.args[1];
    std::memcpy(st.p(R), st.p(A), std::min(R.size, A.size));
    if (R.derivs) {
        if (A.derivs)
            std::memcpy(st.heap + R.offset + R.size, st.heap + A.offset + A.size,
                        2 * std::min(R.size, A.size));
        else
            st.zeroDerivs(R);
    }
}

// Numeric assignment with conversion: int <-> float, scalar -> triple or matrix.
void kConvert(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& A = in.args[1];
    const int elems = std::max<int>(1, R.arraylen);
    const int aElems = std::max<int>(1, A.arraylen);
    for (int e = 0; e < elems; ++e) {
        const int ae = std::min(e, aElems - 1);
        for (int c = 0; c < R.ncomp; ++c) {
            const int ac = A.ncomp == 1 ? 0 : c;
            float v[3];
            for (int d = 0; d < 3; ++d) {
                if (d && (!R.derivs)) break;
                if (A.isInt)
                    v[d] = d ? 0.0f : float(st.i(A)[ae]);
                else if (d && !A.derivs)
                    v[d] = 0.0f;
                else
                    v[d] = st.f(A)[ae * A.ncomp + ac + d * (A.size / 4)];
            }
            if (R.isMatrix && A.ncomp == 1) v[0] = (c % 5 == 0) ? v[0] : 0.0f;
            const int rc = e * R.ncomp + c;
            if (R.isInt) {
                st.i(R)[rc] = int(v[0]);
            } else {
                st.f(R)[rc] = v[0];
                if (R.derivs)
                    st.f(R)[rc + R.size / 4] = v[1], st.f(R)[rc + 2 * (R.size / 4)] = v[2];
            }
        }
    }
}

// ---- components, elements, matrix entries -------------------------------------------------------

int checkedIndex(ExecState& st, const Instr& in, int index, int length, const Operand& of) {
    if (index >= 0 && index < length) return index;
    const MasterOp& mop = st.prog->group->layers[in.layer].master->ops[in.masterOp];
    shaderError(st, in,
                "Index [" + std::to_string(index) + "] out of range " +
                    st.prog->symbols[of.symbol].name.string() + "[0.." +
                    std::to_string(length - 1) + "]: " + mop.sourcefile.string() + ":" +
                    std::to_string(mop.line) + " (group " + st.prog->group->name.string() +
                    ", layer " + std::to_string(in.layer) + " " +
                    st.prog->group->layers[in.layer].layername.string() + ", shader " +
                    st.prog->group->layers[in.layer].master->name.string() + ")");
    return index < 0 ? 0 : length - 1;
}

void kCompref(ExecState& st, const Instr& in) {
    const Operand& A = in.args[1];
    const int c = checkedIndex(st, in, st.integer(in.args[2]), 3, A);
    st.store(in.args[0], 0, st.dual(A, c));
}
void kCompassign(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const int c = checkedIndex(st, in, st.integer(in.args[1]), 3, R);
    st.store(R, c, st.dual(in.args[2], 0));
}
void kMxcompref(ExecState& st, const Instr& in) {
    const Operand& M = in.args[1];
    const int r = checkedIndex(st, in, st.integer(in.args[2]), 4, M);
    const int c = checkedIndex(st, in, st.integer(in.args[3]), 4, M);
    st.store(in.args[0], 0, D2(st.f(M)[r * 4 + c]));
}
void kMxcompassign(ExecState& st, const Instr& in) {
    const Operand& M = in.args[0];
    const int r = checkedIndex(st, in, st.integer(in.args[1]), 4, M);
    const int c = checkedIndex(st, in, st.integer(in.args[2]), 4, M);
    st.f(M)[r * 4 + c] = st.scalar(in.args[3]);
}

// Element e of array A into the non-array R (value and derivatives, converting numbers).
void kAref(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& A = in.args[1];
    const int e = checkedIndex(st, in, st.integer(in.args[2]), std::max<int>(1, A.arraylen), A);
    const uint32_t elemSize = A.size / std::max<int>(1, A.arraylen);
    if (R.isFloat && A.isFloat) {
        for (int c = 0; c < R.ncomp; ++c) {
            const int ac = e * A.ncomp + (A.ncomp == 1 ? 0 : c);
            const float* a = st.f(A);
            D2 v(a[ac]);
            if (A.derivs) v = D2(a[ac], a[ac + A.size / 4], a[ac + 2 * (A.size / 4)]);
            st.store(R, c, v);
        }
        return;
    }
    if (R.isFloat && A.isInt) {
        st.store(R, 0, D2(float(st.i(A)[e])));
        return;
    }
    if (R.isInt && A.isFloat) {
        *st.i(R) = int(st.f(A)[e * A.ncomp]);
        return;
    }
    std::memcpy(st.p(R), st.heap + A.offset + e * elemSize, R.size);
}
void kAassign(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& V = in.args[2];
    const int e = checkedIndex(st, in, st.integer(in.args[1]), std::max<int>(1, R.arraylen), R);
    const uint32_t elemSize = R.size / std::max<int>(1, R.arraylen);
    if (R.isFloat) {
        for (int c = 0; c < R.ncomp; ++c) {
            const int rc = e * R.ncomp + c;
            float* r = st.f(R);
            r[rc] = st.comp(V, c);
            if (R.derivs)
                r[rc + R.size / 4] = st.comp(V, c, 1), r[rc + 2 * (R.size / 4)] = st.comp(V, c, 2);
        }
        return;
    }
    if (R.isInt) {
        st.i(R)[e] = st.integer(V);
        return;
    }
    std::memcpy(st.heap + R.offset + e * elemSize, st.p(V), elemSize);
}
void kArraylength(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = std::max<int>(1, in.args[1].arraylen);
}

// ---- constructors -----------------------------------------------------------------------------

void kTriple3(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    for (int c = 0; c < 3; ++c) st.store(R, c, st.dual(in.args[1 + c], 0));
}
void kTriple1(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    for (int c = 0; c < 3; ++c) st.store(R, c, st.dual(in.args[1], c));
}
// A point, vector or normal given in a named space goes from that space to common (colours in a
// named space are the colour family's).
template <int Kind>
void kTripleSpace(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    Dual2<Vec3> v;
    for (int d = 0; d < 3; ++d)
        v.elem(d) =
            Vec3(st.comp(in.args[2], 0, d), st.comp(in.args[3], 0, d), st.comp(in.args[4], 0, d));
    const ustring space = *st.s(in.args[1]);
    Matrix44 m;
    if (!getSpaceMatrix(st, space, m, true)) {
        shaderError(st, in, "Unknown transformation \"" + space.string() + "\"");
        st.storeVec(R, v);
        return;
    }
    st.storeVec(R, transformDual(m, v, Kind));
}
void kMatrixCtor(ExecState& st, const Instr& in) {
    Matrix44& r = *reinterpret_cast<Matrix44*>(st.f(in.args[0]));
    const int n = in.nargs - 1;
    const Operand* a = in.args + 1;
    int first = 0;
    Matrix44 space;
    bool fromSpace = false;
    if (a[0].isString) {
        const ustring from = *st.s(a[0]);
        if (n >= 2 && a[1].isString) {
            // matrix(from, to): transforms from one space to another.
            Matrix44 mf, mt;
            const ustring to = *st.s(a[1]);
            const bool ok1 = getSpaceMatrix(st, from, mf, true);
            const bool ok2 = getSpaceMatrix(st, to, mt, false);
            if (!ok1) shaderError(st, in, "Unknown transformation \"" + from.string() + "\"");
            if (!ok2) shaderError(st, in, "Unknown transformation \"" + to.string() + "\"");
            r = mf * mt;
            return;
        }
        if (!getSpaceMatrix(st, from, space, true))
            shaderError(st, in, "Unknown transformation \"" + from.string() + "\"");
        fromSpace = true;
        first = 1;
    }
    Matrix44 m;
    if (n - first == 16) {
        for (int k = 0; k < 16; ++k) m[k / 4][k % 4] = st.scalar(a[first + k]);
    } else if (n - first == 1) {
        const float s = st.scalar(a[first]);
        m = Matrix44(s, 0, 0, 0, 0, s, 0, 0, 0, 0, s, 0, 0, 0, 0, s);
    } else {
        m = Matrix44();
    }
    r = fromSpace ? m * space : m;
}

// ---- transforms ---------------------------------------------------------------------------------

template <int Kind>
void kTransform(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& P = in.args[in.nargs - 1];
    Matrix44 m;
    if (in.nargs == 3 && in.args[1].isMatrix) {
        m = *reinterpret_cast<const Matrix44*>(st.f(in.args[1]));
    } else {
        const ustring from = in.nargs == 4 ? *st.s(in.args[1]) : ustring("common");
        const ustring to = *st.s(in.args[in.nargs - 2]);
        Matrix44 mf, mt;
        bool ok = true;
        if (!getSpaceMatrix(st, from, mf, true)) {
            shaderError(st, in, "Unknown transformation \"" + from.string() + "\"");
            ok = false;
        }
        if (!getSpaceMatrix(st, to, mt, false)) {
            shaderError(st, in, "Unknown transformation \"" + to.string() + "\"");
            ok = false;
        }
        m = ok ? mf * mt : Matrix44();
    }
    st.storeVec(R, transformDual(m, st.dvec(P), Kind));
}

void kDeterminant(ExecState& st, const Instr& in) {
    const Matrix44& m = *reinterpret_cast<const Matrix44*>(st.f(in.args[1]));
    st.store(in.args[0], 0, D2(m.determinant()));
}
void kTranspose(ExecState& st, const Instr& in) {
    *reinterpret_cast<Matrix44*>(st.f(in.args[0])) =
        reinterpret_cast<const Matrix44*>(st.f(in.args[1]))->transposed();
}
void kGetmatrix(ExecState& st, const Instr& in) {
    const ustring from = *st.s(in.args[1]);
    const ustring to = *st.s(in.args[2]);
    Matrix44 mf, mt;
    const bool ok = getSpaceMatrix(st, from, mf, true) && getSpaceMatrix(st, to, mt, false);
    *reinterpret_cast<Matrix44*>(st.f(in.args[3])) = ok ? mf * mt : Matrix44();
    *st.i(in.args[0]) = ok;
}

// ---- derivatives
// ---------------------------------------------------------------------------------

template <int Which>
void kDeriv(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& A = in.args[1];
    for (int c = 0; c < R.ncomp; ++c) st.store(R, c, D2(Which == 3 ? 0.0f : st.comp(A, c, Which)));
}
void kFilterwidth(ExecState& st, const Instr& in) {
    const Operand& R = in.args[0];
    const Operand& A = in.args[1];
    for (int c = 0; c < R.ncomp; ++c) {
        const float dx = st.comp(A, c, 1), dy = st.comp(A, c, 2);
        st.store(R, c, D2(std::sqrt(dx * dx + dy * dy)));
    }
}
void kArea(ExecState& st, const Instr& in) {
    const Operand& P = in.args[1];
    const Vec3 dx(st.comp(P, 0, 1), st.comp(P, 1, 1), st.comp(P, 2, 1));
    const Vec3 dy(st.comp(P, 0, 2), st.comp(P, 1, 2), st.comp(P, 2, 2));
    st.store(in.args[0], 0, D2(dx.cross(dy).length()));
}
void kCalculatenormal(ExecState& st, const Instr& in) {
    const Operand& P = in.args[1];
    const Vec3 dx(st.comp(P, 0, 1), st.comp(P, 1, 1), st.comp(P, 2, 1));
    const Vec3 dy(st.comp(P, 0, 2), st.comp(P, 1, 2), st.comp(P, 2, 2));
    st.storeVec(in.args[0], st.sg->flipHandedness ? dy.cross(dx) : dx.cross(dy));
}

bool sameStorage(const Operand& a, const Operand& b) {
    return a.type.basetype == b.type.basetype && a.ncomp == b.ncomp && a.arraylen == b.arraylen;
}

} // namespace

int selectDataKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const int n = k.nargs();
    if (op == "assign" && n == 2) {
        const Operand& R = k.arg(0);
        const Operand& A = k.arg(1);
        if (sameStorage(R, A) || R.isString || R.isClosure) {
            k.in.fn = kCopy;
        } else if ((R.isFloat || R.isInt) && (A.isFloat || A.isInt)) {
            k.in.fn = kConvert;
        } else {
            return k.fail("cannot assign these types"), -1;
        }
        return 1;
    }
    if (op == "arraycopy" && n == 2) return k.in.fn = kCopy, 1;
    if (op == "compref" && n == 3) return k.in.fn = kCompref, 1;
    if (op == "compassign" && n == 3) return k.in.fn = kCompassign, 1;
    if (op == "mxcompref" && n == 4) return k.in.fn = kMxcompref, 1;
    if (op == "mxcompassign" && n == 4) return k.in.fn = kMxcompassign, 1;
    if (op == "aref" && n == 3) return k.in.fn = kAref, 1;
    if (op == "aassign" && n == 3) return k.in.fn = kAassign, 1;
    if (op == "arraylength" && n == 2) return k.in.fn = kArraylength, 1;
    if (op == "color" || op == "point" || op == "vector" || op == "normal") {
        if (n == 4) return k.in.fn = kTriple3, 1;
        if (n == 2) return k.in.fn = kTriple1, 1;
        if (n == 5 && op != "color") {
            k.in.fn = op == "point"    ? kTripleSpace<0>
                      : op == "vector" ? kTripleSpace<1>
                                       : kTripleSpace<2>;
            return 1;
        }
        return 0;
    }
    if (op == "matrix") return k.in.fn = kMatrixCtor, 1;
    if ((op == "transform" || op == "transformv" || op == "transformn") && n == 4 &&
        sameFixedSpace(k.prog, k.arg(1), k.arg(2)))
        return k.in.fn = kTransformIdentity, 1;
    if (op == "transform" && (n == 3 || n == 4)) return k.in.fn = kTransform<0>, 1;
    if (op == "transformv" && (n == 3 || n == 4)) return k.in.fn = kTransform<1>, 1;
    if (op == "transformn" && (n == 3 || n == 4)) return k.in.fn = kTransform<2>, 1;
    if (op == "determinant" && n == 2) return k.in.fn = kDeterminant, 1;
    if (op == "transpose" && n == 2) return k.in.fn = kTranspose, 1;
    if (op == "getmatrix" && n == 4) return k.in.fn = kGetmatrix, 1;
    if (op == "Dx" && n == 2) return k.in.fn = kDeriv<1>, 1;
    if (op == "Dy" && n == 2) return k.in.fn = kDeriv<2>, 1;
    if (op == "Dz" && n == 2) return k.in.fn = kDeriv<3>, 1;
    if (op == "filterwidth" && n == 2) return k.in.fn = kFilterwidth, 1;
    if (op == "area" && n == 2) return k.in.fn = kArea, 1;
    if (op == "calculatenormal" && n == 2) return k.in.fn = kCalculatenormal, 1;
    return 0;
}

namespace {

const MasterSymbol* opArgSymbol(const ShaderMaster& m, const MasterOp& op, int arg) {
    if (arg < 0 || arg >= op.nargs) return nullptr;
    const int s = m.args[size_t(op.firstArg + arg)];
    return s >= 0 ? &m.symbols[size_t(s)] : nullptr;
}

bool isScalarArg(const MasterSymbol* s) {
    return s && (s->type.is_float() || s->type.is_int());
}

// Gabor noise filters over the footprint of its position, so a noise op named "gabor", or by a
// string known only while shading, reads the derivatives of its position even when its result
// has none: the point (the time of the 4-D form is not used), or the one or two floats. Periods
// and options never need them; unnamed noise and the other kinds differentiate their result
// only, which the derivative analysis already traces back to the coordinates.
bool noisePositionTakesDerivs(const ShaderMaster& m, const MasterOp& op, int arg) {
    const std::string_view name = op.opname.string();
    if (name != "noise" && name != "pnoise" && name != "snoise" && name != "psnoise") return false;
    if (arg != 2 && arg != 3) return false;
    const MasterSymbol* kind = opArgSymbol(m, op, 1);
    if (!kind || !kind->type.is_string()) return false;
    if (kind->symtype == SymTypeConst && (kind->sdefaults.empty() || kind->sdefaults[0] != "gabor"))
        return false;
    const MasterSymbol* first = opArgSymbol(m, op, 2);
    if (first && first->type.is_triple()) return arg == 2;
    if (!isScalarArg(first)) return false;
    if (arg == 2) return true;
    // A float after the first is its second coordinate, unless it is the period of the 1-D
    // periodic form (x, px), which is followed by nothing or by options.
    if (name[0] == 'p')
        return isScalarArg(opArgSymbol(m, op, 3)) && isScalarArg(opArgSymbol(m, op, 4)) &&
               isScalarArg(opArgSymbol(m, op, 5));
    return isScalarArg(opArgSymbol(m, op, 3));
}

} // namespace

bool opTakesDerivs(const ShaderMaster& m, const MasterOp& op, int arg) {
    const std::string_view name = op.opname.string();
    if (arg == 1 && (name == "Dx" || name == "Dy" || name == "Dz" || name == "filterwidth" ||
                     name == "area" || name == "calculatenormal"))
        return true;
    // Texture filtering reads the footprint of its coordinates, unless the call gives that
    // footprint itself (explicit derivatives follow the coordinates, before any options).
    const auto footprintFromCoords = [&](int nextArg) {
        const MasterSymbol* next = opArgSymbol(m, op, nextArg);
        return !next || next->type.is_string();
    };
    if (name == "texture" && (arg == 2 || arg == 3)) return footprintFromCoords(4);
    if ((name == "texture3d" || name == "environment") && arg == 2) return footprintFromCoords(3);
    return noisePositionTakesDerivs(m, op, arg);
}

} // namespace OSL
