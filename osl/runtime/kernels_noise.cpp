// Noise: noise, snoise, pnoise, psnoise, cellnoise, hashnoise and the generic noise("type", ...)
// forms.
#include "kernels_registry.h"

#include "gabor_noise.h"
#include "noise_cell_hash.h"
#include "noise_perlin.h"
#include "noise_simplex.h"

#include <string>

namespace OSL {

namespace {

using D2 = Dual2<float>;

enum class NoiseKind : uint8_t {
    Perlin,
    UPerlin,
    Simplex,
    USimplex,
    Cell,
    Hash,
    Null,
    UNull,
    Gabor,
    Unknown,
    ByName // the name is a string only known while shading
};

NoiseKind kindFromName(std::string_view name) {
    if (name == "perlin" || name == "snoise") return NoiseKind::Perlin;
    if (name == "uperlin" || name == "noise") return NoiseKind::UPerlin;
    if (name == "simplex" || name == "simplexnoise") return NoiseKind::Simplex;
    if (name == "usimplex" || name == "usimplexnoise") return NoiseKind::USimplex;
    if (name == "cell" || name == "cellnoise") return NoiseKind::Cell;
    if (name == "hash" || name == "hashnoise") return NoiseKind::Hash;
    if (name == "null") return NoiseKind::Null;
    if (name == "unull") return NoiseKind::UNull;
    if (name == "gabor") return NoiseKind::Gabor;
    return NoiseKind::Unknown;
}

bool periodicSupported(NoiseKind kind) {
    return kind == NoiseKind::Perlin || kind == NoiseKind::UPerlin || kind == NoiseKind::Cell ||
           kind == NoiseKind::Hash || kind == NoiseKind::Gabor;
}

// How an instruction was resolved, packed into Instr::iaux.
struct NoiseShape {
    NoiseKind kind = NoiseKind::UPerlin;
    int dims = 1;
    bool periodic = false;
    bool named = false; // arg 1 is the noise name
    bool dual = false;  // evaluate on Dual2 (the value arithmetic differs in places)

    int pack() const {
        return int(kind) | (dims << 4) | (int(periodic) << 7) | (int(named) << 8) |
               (int(dual) << 9);
    }
    static NoiseShape unpack(int v) {
        NoiseShape s;
        s.kind = NoiseKind(v & 15);
        s.dims = (v >> 4) & 7;
        s.periodic = (v >> 7) & 1;
        s.named = (v >> 8) & 1;
        s.dual = (v >> 9) & 1;
        return s;
    }
};

// The operands of one call, gathered from the heap.
struct NoiseInputs {
    D2 x[4];
    float period[4] = {1, 1, 1, 1};
    int dims = 1;
    int nchan = 1;

    void values(float* v) const {
        for (int d = 0; d < dims; ++d) v[d] = x[d].val();
    }
};

NoiseInputs gather(const ExecState& st, const Instr& in, const NoiseShape& sh) {
    NoiseInputs ni;
    ni.dims = sh.dims;
    ni.nchan = in.args[0].ncomp == 3 ? 3 : 1;
    int a = sh.named ? 2 : 1;
    const Operand& S = in.args[a++];
    const int sdims = sh.dims >= 3 ? 3 : 1;
    for (int c = 0; c < sdims; ++c) ni.x[c] = st.dual(S, c);
    const bool hasT = sh.dims == 2 || sh.dims == 4;
    if (hasT) ni.x[sdims] = st.dual(in.args[a++], 0);
    if (sh.periodic) {
        const Operand& SP = in.args[a++];
        for (int c = 0; c < sdims; ++c) ni.period[c] = st.comp(SP, c);
        if (hasT) ni.period[sdims] = st.comp(in.args[a++], 0);
    }
    return ni;
}

void storeValues(ExecState& st, const Operand& R, const float* v, int nchan) {
    st.zeroDerivs(R);
    float* r = st.f(R);
    for (int c = 0; c < nchan; ++c) r[c] = v[c];
}

void storeDuals(ExecState& st, const Operand& R, const D2* v, int nchan) {
    for (int c = 0; c < nchan; ++c) st.store(R, c, v[c]);
}

void evalPerlin(ExecState& st, const Operand& R, const NoiseInputs& ni, bool unsign, bool periodic,
                bool dual) {
    const float* period = periodic ? ni.period : nullptr;
    if (dual) {
        D2 r[3];
        noise::perlin(r, ni.nchan, ni.x, ni.dims, period);
        if (unsign)
            for (int c = 0; c < ni.nchan; ++c) r[c] = 0.5f * (r[c] + D2(1.0f));
        storeDuals(st, R, r, ni.nchan);
    } else {
        float x[4], r[3];
        ni.values(x);
        noise::perlin(r, ni.nchan, x, ni.dims, period);
        if (unsign)
            for (int c = 0; c < ni.nchan; ++c) r[c] = 0.5f * (r[c] + 1.0f);
        storeValues(st, R, r, ni.nchan);
    }
}

void evalSimplex(ExecState& st, const Operand& R, const NoiseInputs& ni, bool unsign, bool dual) {
    float x[4];
    ni.values(x);
    if (!dual) {
        float r[3];
        for (int c = 0; c < ni.nchan; ++c) {
            r[c] = noise::simplex(x, ni.dims, c, nullptr);
            if (unsign) r[c] = 0.5f * (r[c] + 1.0f);
        }
        storeValues(st, R, r, ni.nchan);
        return;
    }
    D2 r[3];
    for (int c = 0; c < ni.nchan; ++c) {
        float g[4];
        float v = noise::simplex(x, ni.dims, c, g);
        if (unsign) {
            v = 0.5f * (v + 1.0f);
            for (int d = 0; d < ni.dims; ++d) g[d] *= 0.5f;
        }
        float dx = g[0] * ni.x[0].dx(), dy = g[0] * ni.x[0].dy();
        for (int d = 1; d < ni.dims; ++d) {
            dx = dx + g[d] * ni.x[d].dx();
            dy = dy + g[d] * ni.x[d].dy();
        }
        r[c] = D2(v, dx, dy);
    }
    storeDuals(st, R, r, ni.nchan);
}

void evalLattice(ExecState& st, const Operand& R, const NoiseInputs& ni, bool cell, bool periodic) {
    float x[4], r[3];
    ni.values(x);
    if (periodic)
        (cell ? noise::periodicCellNoise : noise::periodicHashNoise)(r, ni.nchan, x, ni.period,
                                                                     ni.dims);
    else
        (cell ? noise::cellNoise : noise::hashNoise)(r, ni.nchan, x, ni.dims);
    storeValues(st, R, r, ni.nchan);
}

void evalConstant(ExecState& st, const Operand& R, float v, int nchan) {
    const float r[3] = {v, v, v};
    storeValues(st, R, r, nchan);
}

// Gabor noise named by a constant gets the gabor family's own kernel; named by a string known
// only while shading, it is handed over here.
void evalGabor(ExecState& st, const Instr& in) {
    execGaborNoise(st, in);
}

void kNoise(ExecState& st, const Instr& in) {
    const NoiseShape sh = NoiseShape::unpack(in.iaux);
    const NoiseInputs ni = gather(st, in, sh);
    const Operand& R = in.args[0];
    NoiseKind kind = sh.kind;
    if (kind == NoiseKind::ByName) {
        const ustring name = *st.s(in.args[1]);
        kind = kindFromName(name.string());
        if (kind == NoiseKind::Unknown || (sh.periodic && !periodicSupported(kind))) {
            evalConstant(st, R, 0.0f, ni.nchan);
            shaderError(st, in, "Unknown noise type \"" + name.string() + "\"");
            return;
        }
    }
    switch (kind) {
    case NoiseKind::Perlin:
    case NoiseKind::UPerlin:
        evalPerlin(st, R, ni, kind == NoiseKind::UPerlin, sh.periodic, sh.dual);
        break;
    case NoiseKind::Simplex:
    case NoiseKind::USimplex:
        evalSimplex(st, R, ni, kind == NoiseKind::USimplex, sh.dual);
        break;
    case NoiseKind::Cell:
    case NoiseKind::Hash:
        evalLattice(st, R, ni, kind == NoiseKind::Cell, sh.periodic);
        break;
    case NoiseKind::Null:
        evalConstant(st, R, 0.0f, ni.nchan);
        break;
    case NoiseKind::UNull:
        evalConstant(st, R, 0.5f, ni.nchan);
        break;
    case NoiseKind::Gabor:
        evalGabor(st, in);
        break;
    default:
        evalConstant(st, R, 0.0f, ni.nchan);
        break;
    }
}

bool numeric(const Operand& o) {
    return (o.isFloat || o.isInt) && !o.isMatrix && o.arraylen == 0 &&
           (o.ncomp == 1 || o.ncomp == 3);
}

// A name the reference compiler would have folded to a constant: a literal, or a parameter
// (its instance value is fixed for the whole group).
bool nameFixedPerGroup(const KernelChoice& k, const Operand& o) {
    if (o.isConst) return true;
    if (o.symbol < 0 || !k.prog.group) return false;
    const ShaderSymbol& sym = k.prog.symbols[size_t(o.symbol)];
    if (sym.layer < 0 || sym.masterSymbol < 0) return false;
    const ShaderMaster& m = *k.prog.group->layers[size_t(sym.layer)].master;
    return m.symbols[size_t(sym.masterSymbol)].symtype == SymTypeParam;
}

} // namespace

int selectNoiseKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    NoiseShape sh;
    if (op == "noise" || op == "pnoise")
        sh.kind = NoiseKind::UPerlin;
    else if (op == "snoise" || op == "psnoise")
        sh.kind = NoiseKind::Perlin;
    else if (op == "cellnoise" || op == "pcellnoise")
        sh.kind = NoiseKind::Cell;
    else if (op == "hashnoise" || op == "phashnoise")
        sh.kind = NoiseKind::Hash;
    else
        return 0;
    sh.periodic = op[0] == 'p';
    const std::string opname(op);
    const int n = k.nargs();
    if (n < 2) return k.fail(opname + " needs a result and coordinates"), -1;
    const Operand& R = k.arg(0);
    if (!R.isFloat || R.isMatrix || R.arraylen || (R.ncomp != 1 && R.ncomp != 3))
        return k.fail(opname + " must return a float or a triple"), -1;

    int a = 1;
    bool fixedName = true;
    if (k.arg(1).isString) {
        if (sh.kind == NoiseKind::Cell || sh.kind == NoiseKind::Hash)
            return k.fail(opname + " takes no noise name"), -1;
        sh.named = true;
        a = 2;
        const Operand& nameOp = k.arg(1);
        if (nameOp.isConst) {
            const ustring name =
                *reinterpret_cast<const ustring*>(k.prog.initImage.data() + nameOp.offset);
            sh.kind = kindFromName(name.string());
            if (sh.kind == NoiseKind::Gabor) return 0;
            if (sh.kind == NoiseKind::Unknown || (sh.periodic && !periodicSupported(sh.kind)))
                return k.fail(std::string(sh.periodic ? "periodic " : "") + "noise type \"" +
                              name.string() + "\" is unknown"),
                       -1;
        } else {
            sh.kind = NoiseKind::ByName;
            fixedName = nameFixedPerGroup(k, nameOp);
        }
    }
    if (a >= n || !numeric(k.arg(a)))
        return k.fail(opname + " needs float or point coordinates"), -1;
    const Operand& S = k.arg(a);
    const bool sTriple = S.ncomp == 3;
    const Operand* T = nullptr;
    // A second coordinate is a float following the first; in periodic form it is told apart
    // from the period by what follows it.
    const int tIndex = a + 1;
    if (sh.periodic ? (n > tIndex + 1 && numeric(k.arg(tIndex + 1)))
                    : (n > tIndex && numeric(k.arg(tIndex)))) {
        T = &k.arg(tIndex);
        if (T->ncomp != 1) return k.fail(opname + ": the second coordinate must be a float"), -1;
    }
    sh.dims = (sTriple ? 3 : 1) + (T ? 1 : 0);
    int next = a + 1 + (T ? 1 : 0);
    if (sh.periodic) {
        const int nper = T ? 2 : 1;
        if (next + nper > n) return k.fail(opname + " needs a period for each coordinate"), -1;
        if (!numeric(k.arg(next)) || k.arg(next).ncomp != S.ncomp ||
            (T && (!numeric(k.arg(next + 1)) || k.arg(next + 1).ncomp != 1)))
            return k.fail(opname + ": periods must match the coordinates"), -1;
        next += nper;
    }
    // Optional "name", value pairs tune gabor noise; other noises ignore them.
    if (next < n && !k.arg(next).isString)
        return k.fail(opname + ": unexpected argument " + std::to_string(next)), -1;

    const bool wantDerivs = R.derivs && (S.derivs || (T && T->derivs));
    switch (sh.kind) {
    case NoiseKind::Cell:
    case NoiseKind::Hash:
    case NoiseKind::Null:
    case NoiseKind::UNull:
        sh.dual = false;
        break;
    case NoiseKind::ByName:
        sh.dual = fixedName ? wantDerivs : true;
        break;
    default:
        sh.dual = wantDerivs;
        break;
    }
    k.in.fn = kNoise;
    k.in.iaux = sh.pack();
    return 1;
}

} // namespace OSL
