// Constant folding, dead-op removal and optimisation warnings over a built program, one layer
// at a time. Folded ops are evaluated by the program's own kernels, writing straight into the
// heap's starting image, so build-time and run-time arithmetic cannot disagree.
#include "optimizer.h"

#include "kernels.h"
#include "shading_context.h"
#include "shading_system_impl.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <string_view>
#include <unordered_set>

namespace OSL {

namespace {

// Ops whose only effect is writing their first argument from the others: no sample state, no
// renderer, no messages. They can be evaluated once when their inputs are known and dropped
// when their result is never read.
bool foldableOp(std::string_view op) {
    static const std::unordered_set<std::string_view> ops = {"assign",
                                                             "add",
                                                             "sub",
                                                             "mul",
                                                             "div",
                                                             "mod",
                                                             "neg",
                                                             "abs",
                                                             "fabs",
                                                             "sqrt",
                                                             "inversesqrt",
                                                             "cbrt",
                                                             "sin",
                                                             "cos",
                                                             "tan",
                                                             "asin",
                                                             "acos",
                                                             "atan",
                                                             "atan2",
                                                             "sinh",
                                                             "cosh",
                                                             "tanh",
                                                             "exp",
                                                             "exp2",
                                                             "expm1",
                                                             "log",
                                                             "log2",
                                                             "log10",
                                                             "logb",
                                                             "pow",
                                                             "erf",
                                                             "erfc",
                                                             "degrees",
                                                             "radians",
                                                             "floor",
                                                             "ceil",
                                                             "round",
                                                             "trunc",
                                                             "sign",
                                                             "step",
                                                             "smoothstep",
                                                             "linearstep",
                                                             "smooth_linearstep",
                                                             "min",
                                                             "max",
                                                             "clamp",
                                                             "mix",
                                                             "select",
                                                             "dot",
                                                             "cross",
                                                             "length",
                                                             "distance",
                                                             "normalize",
                                                             "hypot",
                                                             "fmod",
                                                             "isnan",
                                                             "isinf",
                                                             "isfinite",
                                                             "eq",
                                                             "neq",
                                                             "lt",
                                                             "le",
                                                             "gt",
                                                             "ge",
                                                             "and",
                                                             "or",
                                                             "not",
                                                             "bitand",
                                                             "bitor",
                                                             "xor",
                                                             "compl",
                                                             "shl",
                                                             "shr",
                                                             "compref",
                                                             "aref",
                                                             "arraylength",
                                                             "color",
                                                             "point",
                                                             "vector",
                                                             "normal",
                                                             "matrix",
                                                             "determinant",
                                                             "transpose",
                                                             "luminance",
                                                             "concat",
                                                             "format",
                                                             "substr",
                                                             "strlen",
                                                             "startswith",
                                                             "endswith",
                                                             "stoi",
                                                             "stof",
                                                             "getchar",
                                                             "hash",
                                                             "Dx",
                                                             "Dy",
                                                             "Dz",
                                                             "filterwidth",
                                                             "reflect",
                                                             "faceforward"};
    return ops.count(op) != 0;
}

// Ops that may be dropped when nobody reads what they write, beyond the foldable ones.
bool removableOp(std::string_view op) {
    static const std::unordered_set<std::string_view> ops = {
        "isconstant", "isconnected", "noise",   "snoise", "pnoise",          "psnoise",
        "cellnoise",  "hashnoise",   "refract", "area",   "calculatenormal", "nop"};
    return foldableOp(op) || ops.count(op) != 0;
}

uint32_t writeMask(const MasterOp& op) {
    if (op.argWrite || op.argRead) return op.argWrite;
    return op.nargs ? 1u : 0u;
}
uint32_t readMask(const MasterOp& op) {
    if (op.argWrite || op.argRead) return op.argRead;
    return op.nargs ? ~1u : 0u;
}

struct LayerAnalysis {
    std::vector<int> order;        // executed instructions, in the order they run
    std::vector<int> seq;          // position in `order` per instruction, -1 when never run
    std::vector<uint8_t> guarded;  // runs only under a condition, in a loop or after a return
    std::vector<int> writes;       // per program symbol: executed writes
    std::vector<int> firstReadSeq; // per program symbol: earliest executed read
    std::vector<int> lastWriteSeq; // per program symbol: latest executed write
};

class LayerOptimizer {
public:
    LayerOptimizer(ShadingSystemImpl& sys, const ShaderGroup& group, Program& prog, int layer,
                   std::vector<uint8_t>& constant, std::vector<uint8_t>& removed,
                   OptimizerStats& stats)
        : m_sys(sys), m_group(group), m_prog(prog), m_layer(layer),
          m_master(*group.layers[size_t(layer)].master), m_constant(constant), m_removed(removed),
          m_stats(stats) {}

    void analyse();
    void markConstantParams();
    void fold();
    void propagateCopies(const std::vector<uint32_t>& writtenGlobals);
    bool unchangedUntilRead(int k, int ts, int xs) const;
    bool readsFollowInRegion(int k, int ts) const;
    void fuseAssignments(const std::vector<uint8_t>& jumpTarget);
    void removeDeadOps();
    void warn() const;
    void markBranchesNeverTaken(std::vector<std::vector<uint8_t>>& neverRun) const;

private:
    const MasterOp& masterOp(int k) const {
        return m_master.ops[size_t(m_prog.instrs[size_t(k)].masterOp)];
    }
    const MasterSymbol* masterSymbol(int progSym) const {
        if (progSym < 0) return nullptr;
        const ShaderSymbol& s = m_prog.symbols[size_t(progSym)];
        if (s.layer != m_layer || s.masterSymbol < 0) return nullptr;
        return &m_master.symbols[size_t(s.masterSymbol)];
    }
    bool isLocal(int progSym) const {
        const MasterSymbol* ms = masterSymbol(progSym);
        return ms && (ms->symtype == SymTypeLocal || ms->symtype == SymTypeTemp);
    }
    bool renderOutput(int progSym) const;
    Operand& operand(const Instr& in, int a) {
        return m_prog.operands[size_t(in.args - m_prog.operands.data()) + size_t(a)];
    }
    void reselect(Instr& in) {
        const Instr before = in;
        std::string why;
        if (!selectKernel(m_sys, m_prog, in, masterOp(int(&in - m_prog.instrs.data())).opname, why))
            in = before;
    }
    bool indexInRange(const Instr& in, std::string_view op) const;
    bool evaluate(Instr& in);

    ShadingSystemImpl& m_sys;
    const ShaderGroup& m_group;
    Program& m_prog;
    int m_layer;
    const ShaderMaster& m_master;
    std::vector<uint8_t>& m_constant;
    std::vector<uint8_t>& m_removed;
    OptimizerStats& m_stats;
    LayerAnalysis m_a;
};

void LayerOptimizer::analyse() {
    const ProgramLayer& pl = m_prog.layers[size_t(m_layer)];
    const int n = int(m_prog.instrs.size());
    m_a.seq.assign(size_t(n), -1);
    m_a.guarded.assign(size_t(n), 0);
    auto add = [&](int b, int e) {
        for (int k = b; k < e; ++k)
            if (m_a.seq[size_t(k)] < 0) {
                m_a.seq[size_t(k)] = int(m_a.order.size());
                m_a.order.push_back(k);
            }
    };
    for (const auto& r : pl.initRanges) add(r.first, r.second);
    add(pl.mainBegin, pl.mainEnd);
    auto guard = [&](int b, int e) {
        for (int k = std::max(b, 0); k < std::min(e, n); ++k) m_a.guarded[size_t(k)] = 1;
    };
    for (int k : m_a.order) {
        const Instr& in = m_prog.instrs[size_t(k)];
        switch (in.flow) {
        case Flow::If:
            guard(k + 1, in.jump[1]);
            break;
        case Flow::For:
        case Flow::While:
        case Flow::DoWhile:
            guard(k + 1, in.jump[3]);
            break;
        case Flow::FunctionCall:
            // A function body runs whole unless it can return early.
            for (int j = k + 1; j < in.jump[0] && j < n; ++j)
                if (m_prog.instrs[size_t(j)].flow == Flow::Return) {
                    guard(k + 1, in.jump[0]);
                    break;
                }
            break;
        default:
            break;
        }
    }
    m_a.writes.assign(m_prog.symbols.size(), 0);
    m_a.firstReadSeq.assign(m_prog.symbols.size(), 1 << 30);
    m_a.lastWriteSeq.assign(m_prog.symbols.size(), -1);
    for (int k : m_a.order) {
        const Instr& in = m_prog.instrs[size_t(k)];
        const MasterOp& op = masterOp(k);
        const uint32_t w = writeMask(op), r = readMask(op);
        for (int a = 0; a < in.nargs; ++a) {
            const int s = in.args[a].symbol;
            if (s < 0) continue;
            if (w & (1u << a)) {
                ++m_a.writes[size_t(s)];
                m_a.lastWriteSeq[size_t(s)] =
                    std::max(m_a.lastWriteSeq[size_t(s)], m_a.seq[size_t(k)]);
            }
            if (r & (1u << a))
                m_a.firstReadSeq[size_t(s)] =
                    std::min(m_a.firstReadSeq[size_t(s)], m_a.seq[size_t(k)]);
        }
    }
}

// A parameter is fixed for the whole group when its instance value (or default) is all it can
// ever hold: not fed by a connection, not taken from the geometry, not written by the shader,
// and not meant to be changed interactively.
void LayerOptimizer::markConstantParams() {
    const ProgramLayer& pl = m_prog.layers[size_t(m_layer)];
    const ShaderInstance& inst = m_group.layers[size_t(m_layer)];
    for (int p = pl.firstSymbol; p < pl.firstSymbol + pl.symbolCount; ++p) {
        const ShaderSymbol& sym = m_prog.symbols[size_t(p)];
        const MasterSymbol& ms = m_master.symbols[size_t(sym.masterSymbol)];
        if (ms.symtype == SymTypeConst && sym.hasStorage) {
            m_constant[size_t(p)] = 1;
            continue;
        }
        if (!ms.isParam() || ms.isStruct() || ms.type.is_closure_based() || !sym.hasStorage)
            continue;
        if (m_a.writes[size_t(p)]) continue;
        const InstanceValue* iv = inst.valueFor(sym.masterSymbol);
        if (iv ? !iv->lockgeom : !ms.lockgeom) continue;
        bool fixed = true;
        for (const UserdataParam& u : pl.userdata)
            if (u.name == ms.name) fixed = false;
        for (const Connection& c : m_group.connections)
            if (c.dst.layer == m_layer && c.dst.symbol == sym.masterSymbol) fixed = false;
        for (const ShaderMetadata& md : ms.metadata)
            if (md.name == "interactive" && std::atoi(md.value.c_str()) != 0) fixed = false;
        if (fixed) m_constant[size_t(p)] = 1;
    }
}

bool LayerOptimizer::renderOutput(int progSym) const {
    const MasterSymbol* ms = masterSymbol(progSym);
    if (!ms) return false;
    const std::string qualified =
        m_group.layers[size_t(m_layer)].layername.string() + "." + ms->name.string();
    for (ustring ro : m_group.rendererOutputs)
        if (ro == ms->name || ro.string() == qualified) return true;
    return false;
}

// Element and component selections are folded only when in range; out of range they report
// an error each time they run, which must stay.
bool LayerOptimizer::indexInRange(const Instr& in, std::string_view op) const {
    if (op != "compref" && op != "aref") return true;
    if (in.nargs != 3 || !in.args[2].isInt) return false;
    const int idx = *reinterpret_cast<const int*>(m_prog.initImage.data() + in.args[2].offset);
    const int len =
        op == "compref" ? (in.args[1].isMatrix ? 16 : in.args[1].ncomp) : int(in.args[1].arraylen);
    return idx >= 0 && idx < len;
}

// Runs the op's kernel on the heap's starting image. Returns false, leaving the image as it
// was, when the result would hide a value debug_nan must report at run time.
bool LayerOptimizer::evaluate(Instr& in) {
    const Operand& out = in.args[0];
    const size_t bytes = size_t(out.size) * (out.derivs ? 3 : 1);
    char* at = m_prog.initImage.data() + out.offset;
    std::vector<char> saved(at, at + bytes);
    ShadingContext ctx(m_sys, nullptr);
    ShaderGlobals sg;
    std::memset(static_cast<void*>(&sg), 0, sizeof sg);
    ctx.sg = &sg;
    ctx.prog = &m_prog;
    ctx.currentLayer = m_layer;
    ExecState st{m_prog.initImage.data(), &ctx, &sg, &m_prog};
    in.fn(st, in);
    bool keep = ctx.output.empty() && ctx.errorsSeen.empty();
    if (keep && m_prog.debugNan && out.isFloat) {
        const float* v = reinterpret_cast<const float*>(at);
        for (size_t c = 0; c < bytes / 4; ++c)
            if (!std::isfinite(v[c])) keep = false;
    }
    if (!keep) std::memcpy(at, saved.data(), bytes);
    return keep;
}

// An `if` whose condition is fixed for the group runs one of its two branches at every sample;
// the other branch's ops never run. Derivatives those ops would ask for are not needed.
void LayerOptimizer::markBranchesNeverTaken(std::vector<std::vector<uint8_t>>& neverRun) const {
    for (int k : m_a.order) {
        const Instr& in = m_prog.instrs[size_t(k)];
        if (in.flow != Flow::If || in.layer != m_layer || in.nargs < 1) continue;
        const Operand& c = in.args[0];
        if (!c.isConst && (c.symbol < 0 || !m_constant[size_t(c.symbol)])) continue;
        const char* at = m_prog.initImage.data() + c.offset;
        bool taken;
        if (c.isInt)
            taken = *reinterpret_cast<const int*>(at) != 0;
        else if (c.isFloat)
            taken = *reinterpret_cast<const float*>(at) != 0.0f;
        else
            continue;
        const int begin = taken ? in.jump[0] : k + 1;
        const int end = taken ? in.jump[1] : in.jump[0];
        for (int j = std::max(begin, 0); j < std::min(end, int(m_prog.instrs.size())); ++j) {
            const Instr& dead = m_prog.instrs[size_t(j)];
            if (dead.layer != m_layer) continue;
            auto& layerOps = neverRun[size_t(m_layer)];
            if (layerOps.empty()) layerOps.assign(m_master.ops.size(), 0);
            layerOps[size_t(dead.masterOp)] = 1;
        }
    }
}

void LayerOptimizer::fold() {
    for (int k : m_a.order) {
        Instr& in = m_prog.instrs[size_t(k)];
        if (in.flow != Flow::Plain || m_removed[size_t(k)] || in.nargs < 1 || !in.fn) continue;
        const MasterOp& op = masterOp(k);
        const std::string_view name = op.opname.string();
        const bool isconst = name == "isconstant" && in.nargs == 2;
        if (!isconst && !foldableOp(name)) continue;
        // The only write is the whole first argument, which the op does not also read.
        const uint32_t w = writeMask(op), r = readMask(op);
        if (w != 1u || (r & 1u)) continue;
        const Operand& out = in.args[0];
        if (out.isClosure || !isLocal(out.symbol) || renderOutput(out.symbol)) continue;
        bool inputsFixed = true;
        for (int a = 1; a < in.nargs && !isconst; ++a) {
            const Operand& o = in.args[a];
            if (o.symbol < 0 || !m_constant[size_t(o.symbol)]) inputsFixed = false;
            // Space names select matrices of the sample being shaded.
            if (o.isString && (name == "point" || name == "vector" || name == "normal" ||
                               name == "matrix" || name == "color"))
                inputsFixed = false;
        }
        if (isconst) {
            // Whether the argument is fixed is known now; the answer is a constant itself.
            const int s = in.args[1].symbol;
            in.iaux = s >= 0 && m_constant[size_t(s)];
        }
        if (!inputsFixed || in.useCount || !indexInRange(in, name)) continue;
        // The symbol holds this one value everywhere it is read: written once, by an op that
        // always runs, before every read.
        const int s = out.symbol;
        if (m_a.writes[size_t(s)] != 1 || m_a.guarded[size_t(k)] ||
            m_a.firstReadSeq[size_t(s)] <= m_a.seq[size_t(k)])
            continue;
        if (!evaluate(in)) continue;
        m_constant[size_t(s)] = 1;
        m_removed[size_t(k)] = 1;
        ++m_stats.folded;
    }
}

bool sameStorageKind(const Operand& a, const Operand& b) {
    return a.type == b.type && a.size == b.size && a.derivs == b.derivs &&
           a.isClosure == b.isClosure;
}

// Whether X keeps the value it had at the unconditional copy `k` (into T) at every read of T.
// Execution only moves forward past k, so a write of X matters when it comes after k and
// before the last read of T, or later but inside a loop that also reads T.
bool LayerOptimizer::unchangedUntilRead(int k, int ts, int xs) const {
    std::vector<int> readers, writers;
    int lastRead = -1;
    for (int r : m_a.order) {
        if (m_removed[size_t(r)] || m_a.seq[size_t(r)] <= m_a.seq[size_t(k)]) continue;
        const Instr& in = m_prog.instrs[size_t(r)];
        const MasterOp& op = masterOp(r);
        const uint32_t w = writeMask(op), rd = readMask(op);
        for (int a = 0; a < in.nargs; ++a) {
            if ((rd & (1u << a)) && in.args[a].symbol == ts) {
                readers.push_back(r);
                lastRead = std::max(lastRead, m_a.seq[size_t(r)]);
            }
            if ((w & (1u << a)) && in.args[a].symbol == xs) writers.push_back(r);
        }
    }
    for (int w : writers) {
        if (m_a.seq[size_t(w)] <= lastRead) return false;
        for (int l : m_a.order) {
            const Instr& loop = m_prog.instrs[size_t(l)];
            if (loop.flow != Flow::For && loop.flow != Flow::While && loop.flow != Flow::DoWhile)
                continue;
            auto inside = [&](int x) { return x > l && x < loop.jump[3]; };
            if (!inside(w)) continue;
            for (int r : readers)
                if (inside(r)) return false;
        }
    }
    return true;
}

// Whether every read of T comes after the copy `k` inside the innermost block holding it (a
// branch, a loop part, a function body), so that each read is reached through the copy.
bool LayerOptimizer::readsFollowInRegion(int k, int ts) const {
    int end = 1 << 30;
    if (m_a.guarded[size_t(k)])
        for (int c : m_a.order) {
            if (c >= k) break;
            const Instr& in = m_prog.instrs[size_t(c)];
            int bounds[5] = {c + 1, -1, -1, -1, -1};
            int parts = 0;
            if (in.flow == Flow::If)
                bounds[1] = in.jump[0], bounds[2] = in.jump[1], parts = 2;
            else if (in.flow == Flow::For || in.flow == Flow::While || in.flow == Flow::DoWhile)
                for (int j = 0; j < 4; ++j) bounds[j + 1] = in.jump[j], parts = 4;
            else if (in.flow == Flow::FunctionCall)
                bounds[1] = in.jump[0], parts = 1;
            for (int p = 0; p < parts; ++p)
                if (k >= bounds[p] && k < bounds[p + 1]) end = std::min(end, bounds[p + 1]);
        }
    for (int r : m_a.order) {
        if (r == k || m_removed[size_t(r)]) continue;
        const Instr& in = m_prog.instrs[size_t(r)];
        const uint32_t rd = readMask(masterOp(r));
        for (int a = 0; a < in.nargs; ++a)
            if ((rd & (1u << a)) && in.args[a].symbol == ts && (r < k || r >= end)) return false;
    }
    return true;
}

// `assign T X` with T written nowhere else: readers of T read X instead, when X cannot change
// between the copy and those reads. Each read is reached through the copy, and X is not
// written between them.
void LayerOptimizer::propagateCopies(const std::vector<uint32_t>& writtenGlobals) {
    for (int k : m_a.order) {
        const Instr& in = m_prog.instrs[size_t(k)];
        if (m_removed[size_t(k)] || in.flow != Flow::Plain || in.nargs != 2 || in.useCount ||
            masterOp(k).opname != "assign")
            continue;
        const Operand& t = in.args[0];
        const Operand& x = in.args[1];
        const int ts = t.symbol, xs = x.symbol;
        if (ts < 0 || xs < 0 || ts == xs || !isLocal(ts) || renderOutput(ts) ||
            !sameStorageKind(t, x) || m_a.writes[size_t(ts)] != 1 ||
            m_a.firstReadSeq[size_t(ts)] <= m_a.seq[size_t(k)] || !readsFollowInRegion(k, ts))
            continue;
        const ShaderSymbol& xsym = m_prog.symbols[size_t(xs)];
        const MasterSymbol* xm = masterSymbol(xs);
        if (xsym.layer != m_layer) continue;
        if (xm && xm->symtype == SymTypeGlobal) {
            if (std::find(writtenGlobals.begin(), writtenGlobals.end(), x.offset) !=
                writtenGlobals.end())
                continue;
        } else if (m_a.lastWriteSeq[size_t(xs)] >= m_a.seq[size_t(k)] &&
                   !unchangedUntilRead(k, ts, xs)) {
            continue;
        }
        bool changed = false;
        for (int r : m_a.order) {
            if (r == k || m_removed[size_t(r)]) continue;
            const Instr& reader = m_prog.instrs[size_t(r)];
            const uint32_t w = writeMask(masterOp(r));
            for (int a = 0; a < reader.nargs; ++a)
                if (reader.args[a].symbol == ts && !(w & (1u << a))) {
                    operand(reader, a) = x;
                    changed = true;
                }
            if (changed) reselect(m_prog.instrs[size_t(r)]);
            changed = false;
        }
        // Nobody reads T now; the copy itself goes with the unread ops.
        m_a.firstReadSeq[size_t(ts)] = 1 << 30;
        m_a.firstReadSeq[size_t(xs)] = std::min(m_a.firstReadSeq[size_t(xs)], m_a.seq[size_t(k)]);
    }
}

// `op T ...; assign A T` with T read nowhere else: the op writes A itself. Only when the copy
// directly follows the op and nothing jumps between them, and the op does not read A (its
// kernel may read inputs after writing parts of its output).
void LayerOptimizer::fuseAssignments(const std::vector<uint8_t>& jumpTarget) {
    std::vector<int> reads(m_prog.symbols.size(), 0);
    for (int k : m_a.order) {
        if (m_removed[size_t(k)]) continue;
        const Instr& in = m_prog.instrs[size_t(k)];
        const uint32_t r = readMask(masterOp(k));
        for (int a = 0; a < in.nargs; ++a)
            if ((r & (1u << a)) && in.args[a].symbol >= 0) ++reads[size_t(in.args[a].symbol)];
    }
    for (int k : m_a.order) {
        const int next = k + 1;
        if (next >= int(m_prog.instrs.size()) || m_a.seq[size_t(next)] != m_a.seq[size_t(k)] + 1 ||
            jumpTarget[size_t(next)] || m_removed[size_t(k)] || m_removed[size_t(next)])
            continue;
        Instr& in = m_prog.instrs[size_t(k)];
        const Instr& copy = m_prog.instrs[size_t(next)];
        if (in.flow != Flow::Plain || copy.flow != Flow::Plain || copy.nargs != 2 ||
            copy.useCount || in.nargs < 1 || masterOp(next).opname != "assign")
            continue;
        const MasterOp& op = masterOp(k);
        if (writeMask(op) != 1u || (readMask(op) & 1u)) continue;
        const Operand& t = in.args[0];
        const Operand& a = copy.args[0];
        const int ts = t.symbol;
        if (ts < 0 || copy.args[1].symbol != ts || a.symbol < 0 || a.symbol == ts || !isLocal(ts) ||
            renderOutput(ts) || m_a.writes[size_t(ts)] != 1 || reads[size_t(ts)] != 1 ||
            !sameStorageKind(t, a) || !sameStorageKind(t, copy.args[1]))
            continue;
        bool readsA = false;
        for (int j = 1; j < in.nargs; ++j)
            if (in.args[j].symbol == a.symbol || in.args[j].offset == a.offset) readsA = true;
        if (readsA) continue;
        operand(in, 0) = a;
        reselect(in);
        m_removed[size_t(next)] = 1;
        --reads[size_t(ts)];
    }
}

// Ops writing only locals that no remaining op reads are dropped, repeatedly, since dropping
// one may leave its own inputs unread.
void LayerOptimizer::removeDeadOps() {
    std::vector<int> reads(m_prog.symbols.size(), 0);
    auto countReads = [&](int k, int delta) {
        const Instr& in = m_prog.instrs[size_t(k)];
        const uint32_t r = readMask(masterOp(k));
        for (int a = 0; a < in.nargs; ++a)
            if ((r & (1u << a)) && in.args[a].symbol >= 0)
                reads[size_t(in.args[a].symbol)] += delta;
    };
    for (int k : m_a.order)
        if (!m_removed[size_t(k)]) countReads(k, 1);
    for (bool changed = true; changed;) {
        changed = false;
        for (auto it = m_a.order.rbegin(); it != m_a.order.rend(); ++it) {
            const int k = *it;
            const Instr& in = m_prog.instrs[size_t(k)];
            if (m_removed[size_t(k)] || in.flow != Flow::Plain || in.useCount) continue;
            const MasterOp& op = masterOp(k);
            if (!removableOp(op.opname.string())) continue;
            const uint32_t w = writeMask(op), r = readMask(op);
            bool dead = true;
            for (int a = 0; a < in.nargs && dead; ++a) {
                if (!(w & (1u << a))) continue;
                const int s = in.args[a].symbol;
                if (!isLocal(s) || renderOutput(s)) {
                    dead = false;
                    continue;
                }
                int own = 0;
                for (int b = 0; b < in.nargs; ++b)
                    if ((r & (1u << b)) && in.args[b].symbol == s) ++own;
                if (reads[size_t(s)] - own > 0) dead = false;
            }
            if (!dead) continue;
            countReads(k, -1);
            m_removed[size_t(k)] = 1;
            changed = true;
        }
    }
}

// Idioms that keep work at run time which the group could otherwise have done once.
void LayerOptimizer::warn() const {
    auto fixed = [&](const Operand& o) { return o.symbol >= 0 && m_constant[size_t(o.symbol)]; };
    for (int k : m_a.order) {
        const Instr& in = m_prog.instrs[size_t(k)];
        if (m_removed[size_t(k)] || in.flow != Flow::Plain) continue;
        const MasterOp& op = masterOp(k);
        const std::string_view name = op.opname.string();
        const char* issue = nullptr;
        if ((name == "format" || name == "concat" || name == "substr") && in.nargs >= 1 &&
            !fixed(in.args[0]))
            issue = "new string creation couldn't be optimized to a constant.";
        else if ((name == "texture" || name == "texture3d" || name == "environment" ||
                  name == "gettextureinfo") &&
                 in.nargs >= 2 && in.args[1].isString && !fixed(in.args[1]))
            issue = "texture name cannot be converted to a handle.";
        else if ((name == "strlen" || name == "startswith" || name == "endswith" ||
                  name == "stoi" || name == "stof" || name == "getchar" ||
                  (name == "hash" && in.nargs == 2 && in.args[1].isString)) &&
                 in.nargs >= 2 && !fixed(in.args[1]))
            issue = "need for string characters couldn't be optimized away.";
        if (!issue) continue;
        m_sys.warning("Optimization warning:\n  group:  " + m_group.name.string() +
                      "\n  layer:  " + m_group.layers[size_t(m_layer)].layername.string() +
                      "\n  source: " + op.sourcefile.string() + ":" + std::to_string(op.line) +
                      "\n  issue:  " + std::string(name) + "(): " + issue);
    }
}

// Drops removed instructions, renumbering jumps and layer ranges. A range keeps exactly the
// surviving instructions it held.
void compact(Program& prog, const std::vector<uint8_t>& removed) {
    const int n = int(prog.instrs.size());
    std::vector<int> newIndex(size_t(n) + 1, 0);
    for (int k = 0; k < n; ++k) newIndex[size_t(k) + 1] = newIndex[size_t(k)] + !removed[size_t(k)];
    auto remap = [&](int k) { return k < 0 ? k : newIndex[size_t(std::min(k, n))]; };
    std::vector<Instr> kept;
    kept.reserve(size_t(newIndex[size_t(n)]));
    for (int k = 0; k < n; ++k) {
        if (removed[size_t(k)]) continue;
        Instr in = prog.instrs[size_t(k)];
        for (int& j : in.jump) j = remap(j);
        kept.push_back(in);
    }
    prog.instrs = std::move(kept);
    for (ProgramLayer& pl : prog.layers) {
        pl.mainBegin = remap(pl.mainBegin);
        pl.mainEnd = remap(pl.mainEnd);
        for (auto& r : pl.initRanges) r.first = remap(r.first), r.second = remap(r.second);
    }
}

} // namespace

void optimizeProgram(ShadingSystemImpl& sys, const ShaderGroup& group, Program& prog,
                     OptimizerStats& stats) {
    if (sys.optimize <= 0) return;
    stats.mergedLayers = mergeInstances(sys, group, prog);
    std::vector<uint8_t> constant(prog.symbols.size(), 0);
    std::vector<uint8_t> removed(prog.instrs.size(), 0);
    const int nlayers = int(prog.layers.size());
    std::vector<std::unique_ptr<LayerOptimizer>> layers;
    for (int l = 0; l < nlayers; ++l) {
        layers.push_back(
            std::make_unique<LayerOptimizer>(sys, group, prog, l, constant, removed, stats));
        LayerOptimizer& lo = *layers.back();
        lo.analyse();
        if (sys.optConstantFold) {
            lo.markConstantParams();
            lo.fold();
        }
    }
    if (sys.optConstantFold) {
        std::vector<std::vector<uint8_t>> neverRun(static_cast<size_t>(nlayers));
        for (auto& lo : layers) lo->markBranchesNeverTaken(neverRun);
        for (const auto& l : neverRun)
            if (!l.empty()) {
                stats.neverRun = std::move(neverRun);
                break;
            }
    }
    // Operands of symbols now known to be fixed are constants to the kernels: choosing again
    // lets ops specialise on them (isconstant answers, texture handles, named ray types...).
    for (Operand& o : prog.operands)
        if (o.symbol >= 0 && constant[size_t(o.symbol)]) o.isConst = true;
    for (size_t k = 0; k < prog.instrs.size(); ++k) {
        Instr& in = prog.instrs[k];
        if (removed[k]) continue;
        const Instr before = in;
        std::string why;
        const MasterOp& op = group.layers[size_t(in.layer)].master->ops[size_t(in.masterOp)];
        if (!selectKernel(sys, prog, in, op.opname, why)) in = before;
    }
    std::vector<uint32_t> writtenGlobals;
    std::vector<uint8_t> jumpTarget(prog.instrs.size() + 1, 0);
    for (size_t k = 0; k < prog.instrs.size(); ++k) {
        const Instr& in = prog.instrs[k];
        const MasterOp& op = group.layers[size_t(in.layer)].master->ops[size_t(in.masterOp)];
        const uint32_t w = writeMask(op);
        const ShaderMaster& m = *group.layers[size_t(in.layer)].master;
        for (int a = 0; a < in.nargs; ++a) {
            const int s = in.args[a].symbol;
            if ((w & (1u << a)) && s >= 0 &&
                m.symbols[size_t(prog.symbols[size_t(s)].masterSymbol)].symtype == SymTypeGlobal)
                writtenGlobals.push_back(in.args[a].offset);
        }
        for (int j : in.jump)
            if (j >= 0 && j <= int(prog.instrs.size())) jumpTarget[size_t(j)] = 1;
    }
    for (const ProgramLayer& pl : prog.layers) {
        jumpTarget[size_t(pl.mainBegin)] = 1;
        for (const auto& r : pl.initRanges) jumpTarget[size_t(r.first)] = 1;
    }
    for (auto& lo : layers) {
        if (sys.optCoalesceTemps) {
            lo->propagateCopies(writtenGlobals);
            lo->fuseAssignments(jumpTarget);
        }
        if (sys.optElideUselessOps) lo->removeDeadOps();
        if (sys.optWarnings) lo->warn();
    }
    for (int r : removed) stats.removed += r;
    if (stats.removed) compact(prog, removed);
}

} // namespace OSL
