// The optional run-time checks of the "debug_nan" and "debug_uninit" modes: values that are not
// finite after an op writes them, and values read before anything wrote them.
#include "debug_checks.h"

#include <OpenImageIO/strutil.h>

#include <climits>
#include <cmath>
#include <cstring>
#include <limits>

namespace OSL {

namespace {

// What a local holds before its first assignment while uninitialised reads are looked for.
const ustring kUninitString("!!!uninitialized!!!");

const MasterOp& masterOp(const ExecState& st, const Instr& in) {
    return st.prog->group->layers[size_t(in.layer)].master->ops[size_t(in.masterOp)];
}

const MasterSymbol& masterSymbol(const ExecState& st, const Operand& o) {
    const ShaderSymbol& sym = st.prog->symbols[size_t(o.symbol)];
    return st.prog->group->layers[size_t(sym.layer)].master->symbols[size_t(sym.masterSymbol)];
}

// A scoped local is written as "___NNN_name" in the OSO; messages use the name.
std::string unmangled(ustring name) {
    const std::string& n = name.string();
    if (n.rfind("___", 0) != 0) return n;
    size_t k = 3;
    while (k < n.size() && n[k] >= '0' && n[k] <= '9') ++k;
    if (k > 3 && k < n.size() && n[k] == '_') return n.substr(k + 1);
    return n;
}

// The part of an op's argument the op reads or writes: everything, or for element and component
// ops only the one addressed.
void checkedRange(const ExecState& st, const Instr& in, int arg, int& first, int& count) {
    const Operand& o = in.args[arg];
    const int elems = std::max<int>(1, o.arraylen);
    first = 0;
    count = elems * o.ncomp;
    const ustring op = masterOp(st, in).opname;
    auto index = [&](int a) { return in.args[a].isInt ? *st.i(in.args[a]) : -1; };
    int at = -1;
    if ((op == "aref" && arg == 1) || (op == "aassign" && arg == 0)) {
        const int k = index(arg == 1 ? 2 : 1);
        if (k >= 0 && k < elems) at = k * o.ncomp, count = o.ncomp;
    } else if ((op == "compref" && arg == 1) || (op == "compassign" && arg == 0)) {
        const int k = index(arg == 1 ? 2 : 1);
        if (k >= 0 && k < o.ncomp) at = k, count = 1;
    } else if ((op == "mxcompref" && arg == 1) || (op == "mxcompassign" && arg == 0)) {
        const int r = index(arg == 1 ? 2 : 1), c = index(arg == 1 ? 3 : 2);
        if (r >= 0 && r < 4 && c >= 0 && c < 4) at = r * 4 + c, count = 1;
    }
    if (at >= 0) first = at;
}

} // namespace

void markUninitialized(Program& prog) {
    for (const ShaderSymbol& sym : prog.symbols) {
        if (!sym.hasStorage || sym.layer < 0) continue;
        const MasterSymbol& ms =
            prog.group->layers[size_t(sym.layer)].master->symbols[size_t(sym.masterSymbol)];
        if (ms.symtype != SymTypeLocal && ms.symtype != SymTypeTemp) continue;
        char* at = prog.initImage.data() + sym.offset;
        const size_t n = sym.type.numelements() * sym.type.aggregate;
        if (sym.type.basetype == TypeDesc::FLOAT) {
            const float nan = std::numeric_limits<float>::quiet_NaN();
            for (size_t k = 0; k < n; ++k) std::memcpy(at + 4 * k, &nan, 4);
        } else if (sym.type.basetype == TypeDesc::INT) {
            const int v = INT_MIN;
            for (size_t k = 0; k < n; ++k) std::memcpy(at + 4 * k, &v, 4);
        } else if (sym.type.basetype == TypeDesc::STRING) {
            for (size_t k = 0; k < n; ++k) std::memcpy(at + 8 * k, &kUninitString, 8);
        }
    }
}

std::vector<int> reportedOpNumbers(const ShaderGroup& group, int layer) {
    // Op numbers as the reference shading system counts them: it puts a "useparam" op at the
    // start of the main code for the output parameters that others see, and one in front of
    // each op that first reads parameters.
    const ShaderInstance& inst = group.layers[size_t(layer)];
    const ShaderMaster& m = *inst.master;
    const int nops = int(m.ops.size());
    std::vector<uint8_t> conditional(size_t(nops), 0);
    for (int k = 0; k < nops; ++k) {
        const MasterOp& op = m.ops[size_t(k)];
        int end = -1;
        if (op.opname == "if") end = op.jump[1];
        if (op.opname == "for" || op.opname == "while" || op.opname == "dowhile") end = op.jump[3];
        for (int j = k + 1; j < end && j < nops; ++j) conditional[size_t(j)] = 1;
    }
    std::vector<uint8_t> initialized(m.symbols.size(), 0);
    auto visibleOutput = [&](int s) {
        const MasterSymbol& ms = m.symbols[size_t(s)];
        if (!ms.isOutput()) return false;
        for (const Connection& c : group.connections)
            if ((c.src.layer == layer && c.src.symbol == s) ||
                (c.dst.layer == layer && c.dst.symbol == s))
                return true;
        for (ustring ro : group.rendererOutputs)
            if (ro == ms.name || ro.string() == inst.layername.string() + "." + ms.name.string())
                return true;
        return ms.initBegin >= 0 && !inst.valueFor(s);
    };
    std::vector<int> numbers(size_t(nops) + 1, 0);
    int shift = 0;
    for (int k = 0; k <= nops; ++k) {
        if (k == m.mainBegin) {
            bool any = false;
            for (size_t s = 0; s < m.symbols.size(); ++s)
                if (visibleOutput(int(s))) initialized[s] = 1, any = true;
            if (any) ++shift;
        }
        if (k == nops) break;
        const MasterOp& op = m.ops[size_t(k)];
        const bool inMain = k >= m.mainBegin;
        bool reads = false;
        for (int a = 0; a < op.nargs; ++a) {
            const int s = m.args[size_t(op.firstArg + a)];
            if (s < 0 || !m.symbols[size_t(s)].isParam() || !(op.argRead & (1u << a))) continue;
            if (initialized[size_t(s)] && inMain) continue;
            reads = true;
            if (!conditional[size_t(k)]) initialized[size_t(s)] = 1;
        }
        if (reads) ++shift;
        numbers[size_t(k)] = k + shift;
    }
    return numbers;
}

void checkUninitializedReads(ExecState& st, const Instr& in) {
    const MasterOp& mop = masterOp(st, in);
    for (int a = 0; a < in.nargs; ++a) {
        if (!(mop.argRead & (1u << a))) continue;
        const Operand& o = in.args[a];
        if (o.symbol < 0 || o.isConst || o.isClosure) continue;
        int first, count;
        checkedRange(st, in, a, first, count);
        bool uninit = false;
        if (o.isFloat) {
            float* v = st.f(o);
            for (int c = first; c < first + count; ++c)
                if (!std::isfinite(v[c])) v[c] = 0.0f, uninit = true;
        } else if (o.isInt) {
            int* v = st.i(o);
            for (int c = first; c < first + count; ++c)
                if (v[c] == INT_MIN) v[c] = 0, uninit = true;
        } else if (o.isString) {
            ustring* v = st.s(o);
            for (int c = first; c < first + count; ++c)
                if (v[c] == kUninitString) v[c] = ustring(), uninit = true;
        }
        if (!uninit) continue;
        const ShaderGroup& g = *st.prog->group;
        const ShaderInstance& inst = g.layers[size_t(in.layer)];
        const std::vector<int>& numbers = st.prog->reportedOps[size_t(in.layer)];
        const int opnum =
            in.masterOp < int(numbers.size()) ? numbers[size_t(in.masterOp)] : in.masterOp;
        shaderError(st, in,
                    OIIO::Strutil::fmt::format(
                        "Detected possible use of uninitialized value in {} {} at {}:{} (group "
                        "{}, layer {} {}, shader {}, op {} '{}', arg {})",
                        o.type.c_str(), unmangled(masterSymbol(st, o).name), mop.sourcefile,
                        mop.line, g.name.empty() ? "<unnamed group>" : g.name.c_str(), in.layer,
                        inst.layername, inst.master->name, opnum, mop.opname, a));
    }
}

void checkNonFiniteWrites(ExecState& st, const Instr& in) {
    const MasterOp& mop = masterOp(st, in);
    for (int a = 0; a < in.nargs; ++a) {
        if (!(mop.argWrite & (1u << a))) continue;
        const Operand& o = in.args[a];
        if (!o.isFloat || o.symbol < 0) continue;
        int first, count;
        checkedRange(st, in, a, first, count);
        const float* v = st.f(o);
        const int stride = int(o.size / 4);
        auto firstBad = [&](int& plane) {
            for (plane = 0; plane < (o.derivs ? 3 : 1); ++plane)
                for (int c = first; c < first + count; ++c)
                    if (!std::isfinite(v[plane * stride + c])) return v[plane * stride + c];
            return 0.0f;
        };
        int d = 0;
        const float x = firstBad(d);
        if (std::isfinite(x)) continue;
        shaderError(st, in,
                    OIIO::Strutil::fmt::format("Detected {} value in {}{} at {}:{} (op {})",
                                               std::isnan(x) ? "nan" : (x > 0 ? "inf" : "-inf"),
                                               d > 0 ? "the derivatives of " : "",
                                               unmangled(masterSymbol(st, o).name), mop.sourcefile,
                                               mop.line, mop.opname));
    }
}

} // namespace OSL
