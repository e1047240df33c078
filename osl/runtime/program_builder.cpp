// Turns an ended shader group into its Program: decides which symbols carry derivatives, lays
// every symbol out in the heap, resolves operands and kernels, and records connections and
// which layers run eagerly.
#include "debug_checks.h"
#include "kernels.h"
#include "optimizer.h"
#include "shading_system_impl.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <set>

namespace OSL {

namespace {

std::atomic<uint64_t> g_programSerial{0};

bool derivCapable(const TypeSpec& t) {
    return !t.is_closure_based() && !t.is_structure_based() &&
           t.simpletype().basetype == TypeDesc::FLOAT &&
           t.simpletype().aggregate != TypeDesc::MATRIX44;
}

GlobalId globalId(ustring n) {
    static const std::pair<const char*, GlobalId> table[] = {
        {"P", GlobalId::P},       {"I", GlobalId::I},         {"N", GlobalId::N},
        {"Ng", GlobalId::Ng},     {"u", GlobalId::u},         {"v", GlobalId::v},
        {"dPdu", GlobalId::dPdu}, {"dPdv", GlobalId::dPdv},   {"Ps", GlobalId::Ps},
        {"time", GlobalId::time}, {"dtime", GlobalId::dtime}, {"dPdtime", GlobalId::dPdtime},
        {"Ci", GlobalId::Ci}};
    for (const auto& e : table)
        if (n == e.first) return e.second;
    return GlobalId::Other;
}

int arrayLengthOf(const MasterSymbol& s, const InstanceValue* iv) {
    int len = s.type.arraylength();
    if (len >= 0) return len;
    if (iv) return std::max(1, iv->type.arraylen > 0 ? iv->type.arraylen : 1);
    const TypeDesc el = s.type.simpletype().elementtype();
    const int per = std::max<int>(1, int(el.aggregate));
    size_t n = el.basetype == TypeDesc::STRING ? s.sdefaults.size()
               : el.basetype == TypeDesc::INT  ? s.idefaults.size()
                                               : s.fdefaults.size();
    return std::max<int>(1, int(n) / per);
}

Operand makeOperand(TypeDesc t, uint32_t offset, bool derivs) {
    Operand o;
    o.type = t;
    o.offset = offset;
    o.derivs = derivs;
    o.arraylen = uint16_t(std::max(0, t.arraylen));
    o.size = uint32_t(t.size());
    o.isClosure = t.basetype == TypeDesc::PTR;
    o.isString = t.basetype == TypeDesc::STRING;
    o.isInt = t.basetype == TypeDesc::INT;
    o.isFloat = t.basetype == TypeDesc::FLOAT;
    o.isMatrix = o.isFloat && t.aggregate == TypeDesc::MATRIX44;
    o.ncomp = uint16_t(o.isFloat ? int(t.aggregate) : 1);
    return o;
}

uint32_t align8(uint32_t x) {
    return (x + 7u) & ~7u;
}

} // namespace

// Writes a parameter's value (instance value, else default) in storage form.
void writeValue(char* dst, TypeDesc t, const MasterSymbol& s, const InstanceValue* iv) {
    const TypeDesc el = t.elementtype();
    const int total = int(t.numelements()) * int(el.aggregate);
    if (iv) {
        const TypeDesc vt = iv->type;
        const int vtotal = int(iv->data.size() / std::max<size_t>(1, vt.basesize()));
        for (int k = 0; k < total; ++k) {
            const int sk = vtotal == 0 ? -1 : (vtotal == 1 ? 0 : k);
            if (sk < 0 || sk >= vtotal) break;
            if (el.basetype == TypeDesc::STRING) {
                if (vt.basetype == TypeDesc::STRING)
                    std::memcpy(dst + 8 * k, iv->data.data() + 8 * sk, 8);
            } else if (el.basetype == TypeDesc::INT) {
                int v = vt.basetype == TypeDesc::FLOAT
                            ? int(reinterpret_cast<const float*>(iv->data.data())[sk])
                            : reinterpret_cast<const int*>(iv->data.data())[sk];
                std::memcpy(dst + 4 * k, &v, 4);
            } else if (el.basetype == TypeDesc::FLOAT) {
                float v = vt.basetype == TypeDesc::INT
                              ? float(reinterpret_cast<const int*>(iv->data.data())[sk])
                              : reinterpret_cast<const float*>(iv->data.data())[sk];
                std::memcpy(dst + 4 * k, &v, 4);
            }
        }
        return;
    }
    for (int k = 0; k < total; ++k) {
        if (el.basetype == TypeDesc::STRING) {
            if (k < int(s.sdefaults.size())) std::memcpy(dst + 8 * k, &s.sdefaults[k], 8);
        } else if (el.basetype == TypeDesc::INT) {
            if (k < int(s.idefaults.size())) std::memcpy(dst + 4 * k, &s.idefaults[k], 4);
        } else if (el.basetype == TypeDesc::FLOAT) {
            float v = 0.0f;
            if (k < int(s.fdefaults.size()))
                v = s.fdefaults[k];
            else if (s.fdefaults.size() == 1 && el.aggregate > 1 && el.aggregate != 16)
                v = s.fdefaults[0];
            std::memcpy(dst + 4 * k, &v, 4);
        }
    }
}

namespace {

// Which symbols of each layer carry derivatives: seeded where ops take them, then propagated
// backwards through every op that computes a symbol from others and along connections, until
// nothing changes. Ops marked in `neverRun` (per layer, per op) are left out.
std::vector<std::vector<uint8_t>>
derivativeNeeds(const ShaderGroup& group, const std::vector<std::vector<uint8_t>>& neverRun) {
    const int nlayers = int(group.layers.size());
    auto skipped = [&](int l, size_t o) {
        return size_t(l) < neverRun.size() && o < neverRun[size_t(l)].size() &&
               neverRun[size_t(l)][o];
    };
    std::vector<std::vector<uint8_t>> needs(nlayers);
    for (int l = 0; l < nlayers; ++l) {
        const ShaderMaster& m = *group.layers[l].master;
        needs[l].assign(m.symbols.size(), 0);
        for (size_t s = 0; s < m.symbols.size(); ++s)
            if (m.symbols[s].hasDerivsHint && derivCapable(m.symbols[s].type)) needs[l][s] = 1;
        for (size_t o = 0; o < m.ops.size(); ++o) {
            const MasterOp& op = m.ops[o];
            if (skipped(l, o)) continue;
            for (int a = 0; a < op.nargs; ++a) {
                const int s = m.args[op.firstArg + a];
                if (s < 0 || !derivCapable(m.symbols[s].type)) continue;
                if ((op.argDerivs & (1u << a)) || opTakesDerivs(m, op, a)) needs[l][s] = 1;
            }
        }
    }
    for (bool changed = true; changed;) {
        changed = false;
        for (int l = 0; l < nlayers; ++l) {
            const ShaderMaster& m = *group.layers[l].master;
            for (size_t o = 0; o < m.ops.size(); ++o) {
                const MasterOp& op = m.ops[o];
                if (skipped(l, o)) continue;
                const uint32_t w = op.argWrite ? op.argWrite : (op.nargs ? 1u : 0u);
                bool outNeeds = false;
                for (int a = 0; a < op.nargs; ++a) {
                    const int s = m.args[op.firstArg + a];
                    if ((w & (1u << a)) && s >= 0 && needs[l][s]) outNeeds = true;
                }
                if (!outNeeds) continue;
                for (int a = 0; a < op.nargs; ++a) {
                    const int s = m.args[op.firstArg + a];
                    if (s < 0 || (w & (1u << a)) || needs[l][s]) continue;
                    if (!derivCapable(m.symbols[s].type) || m.symbols[s].symtype == SymTypeConst)
                        continue;
                    needs[l][s] = 1;
                    changed = true;
                }
            }
        }
        for (const Connection& c : group.connections) {
            if (needs[c.dst.layer][c.dst.symbol] && !needs[c.src.layer][c.src.symbol] &&
                derivCapable(group.layers[c.src.layer].master->symbols[c.src.symbol].type)) {
                needs[c.src.layer][c.src.symbol] = 1;
                changed = true;
            }
        }
    }

    return needs;
}

// One build; `neverRun` names ops the optimiser found a fixed condition skips (their derivative
// needs are left out); the optimiser's own findings come back in `found`.
std::unique_ptr<Program> buildOnce(ShadingSystemImpl& sys, const ShaderGroup& group,
                                   std::string& error,
                                   const std::vector<std::vector<uint8_t>>& neverRun,
                                   std::vector<std::vector<uint8_t>>& found,
                                   std::vector<std::vector<uint8_t>>& needs) {
    auto prog = std::make_unique<Program>();
    prog->group = &group;
    prog->system = &sys;
    prog->serial = ++g_programSerial;
    const int nlayers = int(group.layers.size());
    if (nlayers == 0) {
        error = "shader group has no layers";
        return nullptr;
    }

    // Which symbols are fed by connections.
    std::vector<std::vector<int>> connectedTo(nlayers);
    for (size_t c = 0; c < group.connections.size(); ++c)
        connectedTo[group.connections[c].dst.layer].push_back(int(c));
    auto isConnectedParam = [&](int layer, int sym) {
        for (int c : connectedTo[layer])
            if (group.connections[c].dst.symbol == sym) return true;
        return false;
    };

    // 1. Derivatives.
    needs = derivativeNeeds(group, neverRun);

    // 2. Layout: globals, then constants, then one region per layer (reset when it runs).
    uint32_t cursor = 0;
    std::vector<std::vector<int>> symIndex(nlayers); // master symbol -> Program::symbols index
    std::vector<std::vector<TypeDesc>> symType(nlayers);
    auto globalSlot = [&](ustring name, TypeDesc t, bool derivs) -> GlobalSlot& {
        for (GlobalSlot& g : prog->globals)
            if (g.name == name) {
                g.derivs = g.derivs || derivs;
                return g;
            }
        GlobalSlot g;
        g.name = name;
        g.type = t;
        g.id = globalId(name);
        g.derivs = derivs;
        prog->globals.push_back(g);
        return prog->globals.back();
    };
    for (int l = 0; l < nlayers; ++l) {
        const ShaderMaster& m = *group.layers[l].master;
        for (size_t s = 0; s < m.symbols.size(); ++s)
            if (m.symbols[s].symtype == SymTypeGlobal)
                globalSlot(m.symbols[s].name, m.symbols[s].type.simpletype(), needs[l][s]);
    }
    for (GlobalSlot& g : prog->globals) {
        cursor = align8(cursor);
        g.offset = cursor;
        cursor += uint32_t(g.type.size()) * (g.derivs ? 3 : 1);
    }
    for (GlobalSlot& g : prog->globals)
        if (g.id == GlobalId::Ci) prog->hasCi = true, prog->ciOffset = g.offset;

    struct Placement {
        uint32_t offset;
        bool storage;
    };
    std::vector<std::vector<Placement>> place(nlayers);
    auto placeSymbol = [&](int l, int s, uint32_t& at) {
        const ShaderInstance& inst = group.layers[l];
        const MasterSymbol& ms = inst.master->symbols[s];
        TypeDesc t = ms.type.is_closure_based() ? TypeDesc(TypeDesc::PTR, ms.type.arraylength())
                                                : ms.type.simpletype();
        if (t.arraylen < 0) {
            t.arraylen = arrayLengthOf(ms, inst.valueFor(s));
            for (int c : connectedTo[l]) {
                const Connection& cn = group.connections[c];
                if (cn.dst.symbol == s && cn.dst.arrayIndex < 0 &&
                    symType[cn.src.layer][cn.src.symbol].arraylen > 0 && cn.src.arrayIndex < 0)
                    t.arraylen = symType[cn.src.layer][cn.src.symbol].arraylen;
            }
        }
        symType[l][s] = t;
        at = align8(at);
        place[l][s] = {at, true};
        at += uint32_t(t.size()) * (needs[l][s] ? 3 : 1);
    };
    for (int l = 0; l < nlayers; ++l) {
        const ShaderMaster& m = *group.layers[l].master;
        place[l].assign(m.symbols.size(), {0, false});
        symType[l].assign(m.symbols.size(), TypeDesc());
        for (size_t s = 0; s < m.symbols.size(); ++s) {
            const MasterSymbol& ms = m.symbols[s];
            if (ms.symtype == SymTypeConst && !ms.isStruct()) placeSymbol(l, int(s), cursor);
        }
    }
    for (int l = 0; l < nlayers; ++l) {
        const ShaderMaster& m = *group.layers[l].master;
        ProgramLayer pl;
        pl.name = group.layers[l].layername;
        cursor = align8(cursor);
        pl.regionBegin = cursor;
        for (int pass = 0; pass < 2; ++pass)
            for (size_t s = 0; s < m.symbols.size(); ++s) {
                const MasterSymbol& ms = m.symbols[s];
                if (ms.isStruct() || ms.symtype == SymTypeConst || ms.symtype == SymTypeGlobal)
                    continue;
                if (ms.type.is_unknown() || ms.symtype == SymTypeFunction ||
                    ms.symtype == SymTypeType)
                    continue;
                if ((pass == 0) != ms.isParam()) continue;
                placeSymbol(l, int(s), cursor);
            }
        cursor = align8(cursor);
        pl.regionEnd = cursor;
        prog->layers.push_back(pl);
    }
    prog->heapSize = align8(cursor);
    prog->initImage.assign(prog->heapSize, 0);

    // 3. Symbols for find_symbol, and starting values.
    for (int l = 0; l < nlayers; ++l) {
        const ShaderInstance& inst = group.layers[l];
        const ShaderMaster& m = *inst.master;
        prog->layers[l].firstSymbol = int(prog->symbols.size());
        symIndex[l].assign(m.symbols.size(), -1);
        for (size_t s = 0; s < m.symbols.size(); ++s) {
            const MasterSymbol& ms = m.symbols[s];
            ShaderSymbol sym;
            sym.name = ms.name;
            sym.layer = l;
            sym.masterSymbol = int(s);
            sym.programSerial = prog->serial;
            if (ms.symtype == SymTypeGlobal) {
                GlobalSlot& g = globalSlot(ms.name, ms.type.simpletype(), false);
                sym.type = g.type;
                sym.offset = g.offset;
                sym.hasStorage = true;
                sym.derivs = g.derivs;
            } else if (place[l][s].storage) {
                sym.type = symType[l][s];
                sym.offset = place[l][s].offset;
                sym.hasStorage = true;
                sym.derivs = needs[l][s];
                if (!ms.type.is_closure_based())
                    writeValue(prog->initImage.data() + sym.offset, sym.type, ms,
                               ms.isParam() ? inst.valueFor(int(s)) : nullptr);
            } else {
                sym.type = ms.type.simpletype();
            }
            symIndex[l][s] = int(prog->symbols.size());
            prog->symbols.push_back(sym);
        }
        prog->layers[l].symbolCount = int(prog->symbols.size()) - prog->layers[l].firstSymbol;
        for (size_t s = 0; s < m.symbols.size(); ++s) {
            const MasterSymbol& ms = m.symbols[s];
            if (ms.isParam() && ms.initBegin >= 0 && !inst.valueFor(int(s)) &&
                !isConnectedParam(l, int(s)))
                prog->layers[l].initRanges.emplace_back(ms.initBegin, ms.initEnd);
            const InstanceValue* iv = inst.valueFor(int(s));
            const bool geometric = iv ? !iv->lockgeom : !ms.lockgeom;
            if (ms.isParam() && geometric && !ms.isStruct() && place[l][s].storage &&
                !isConnectedParam(l, int(s))) {
                const ShaderSymbol& sym = prog->symbols[size_t(symIndex[l][s])];
                prog->layers[l].userdata.push_back(
                    {ms.name, makeOperand(sym.type, sym.offset, sym.derivs)});
            }
        }
    }

    auto operandFor = [&](int l, int s) {
        const ShaderSymbol& sym = prog->symbols[symIndex[l][s]];
        Operand o = makeOperand(sym.type, sym.offset, sym.derivs);
        o.symbol = symIndex[l][s];
        o.isConst = group.layers[l].master->symbols[s].symtype == SymTypeConst;
        return o;
    };

    // 4. Connections: one copy per connection, grouped by downstream parameter.
    std::vector<std::vector<int>> connParamIndex(nlayers);
    for (int l = 0; l < nlayers; ++l)
        connParamIndex[l].assign(group.layers[l].master->symbols.size(), -1);
    for (const Connection& c : group.connections) {
        ConnectionCopy cc;
        cc.srcLayer = c.src.layer;
        cc.src = operandFor(c.src.layer, c.src.symbol);
        cc.dst = operandFor(c.dst.layer, c.dst.symbol);
        cc.srcArrayIndex = c.src.arrayIndex;
        cc.srcComponent = c.src.component;
        cc.dstArrayIndex = c.dst.arrayIndex;
        cc.dstComponent = c.dst.component;
        int& k = connParamIndex[c.dst.layer][c.dst.symbol];
        if (k < 0) {
            k = int(prog->connectedParams.size());
            ConnectedParam cp;
            cp.layer = c.dst.layer;
            prog->connectedParams.push_back(cp);
        }
        prog->connectedParams[k].sources.push_back(int(prog->copies.size()));
        prog->copies.push_back(cc);
    }

    // 5. Instructions.
    size_t totalOps = 0, totalArgs = 0;
    for (const ShaderInstance& inst : group.layers)
        totalOps += inst.master->ops.size(), totalArgs += inst.master->args.size();
    prog->operands.reserve(totalArgs);
    prog->instrs.reserve(totalOps);
    std::vector<std::pair<size_t, size_t>> argRanges;
    for (int l = 0; l < nlayers; ++l) {
        const ShaderMaster& m = *group.layers[l].master;
        const int base = int(prog->instrs.size());
        prog->layers[l].mainBegin = base + m.mainBegin;
        prog->layers[l].mainEnd = base + m.mainEnd;
        for (auto& r : prog->layers[l].initRanges) r.first += base, r.second += base;
        for (size_t k = 0; k < m.ops.size(); ++k) {
            const MasterOp& op = m.ops[k];
            Instr in;
            in.layer = l;
            in.masterOp = int(k);
            in.nargs = op.nargs;
            for (int j = 0; j < 4; ++j) in.jump[j] = op.jump[j] >= 0 ? op.jump[j] + base : -1;
            argRanges.emplace_back(prog->operands.size(), op.nargs);
            std::set<int> uses;
            for (int a = 0; a < op.nargs; ++a) {
                const int s = m.args[op.firstArg + a];
                prog->operands.push_back(operandFor(l, s));
                if (connParamIndex[l][s] >= 0) uses.insert(connParamIndex[l][s]);
            }
            in.useBegin = int(prog->uses.size());
            in.useCount = int(uses.size());
            prog->uses.insert(prog->uses.end(), uses.begin(), uses.end());
            prog->instrs.push_back(in);
        }
    }
    for (size_t k = 0; k < prog->instrs.size(); ++k) {
        Instr& in = prog->instrs[k];
        in.args = prog->operands.data() + argRanges[k].first;
        const MasterOp& op = group.layers[in.layer].master->ops[in.masterOp];
        std::string why;
        if (!selectKernel(sys, *prog, in, op.opname, why)) {
            error = "layer \"" + group.layers[in.layer].layername.string() + "\" (shader " +
                    group.layers[in.layer].master->name.string() + "), op " + op.opname.string() +
                    ": " + why;
            return nullptr;
        }
    }

    // 6. Which layers run at every execute: the entry layers (the last one unless named) and
    //    those holding renderer outputs. The others run only when a downstream layer reads one
    //    of their outputs.
    for (int l = 0; l < nlayers; ++l) {
        ProgramLayer& pl = prog->layers[l];
        const ShaderInstance& inst = group.layers[l];
        if (group.entryLayers.empty())
            pl.runsEagerly = l == nlayers - 1;
        else
            for (ustring e : group.entryLayers)
                if (e == inst.layername) pl.runsEagerly = pl.isEntry = true;
        for (const MasterSymbol& ms : inst.master->symbols)
            if (ms.isOutput())
                for (ustring ro : group.rendererOutputs)
                    if (ro == ms.name ||
                        ro.string() == inst.layername.string() + "." + ms.name.string())
                        pl.runsEagerly = true;
        // A layer that writes globals (Ci, N...) runs up front, so that downstream layers see
        // what it wrote whether or not they read one of its outputs.
        // Branches on a parameter whose value is fixed for the group cannot be taken (the
        // reference folds them away), so their writes do not count.
        const ShaderMaster& m = *inst.master;
        auto fixedCondition = [&](int sym, bool& value) {
            const MasterSymbol& ms = m.symbols[size_t(sym)];
            const bool constant = ms.symtype == SymTypeConst;
            if (!constant) {
                if (!ms.isParam() || ms.isOutput() || ms.initBegin >= 0 || isConnectedParam(l, sym))
                    return false;
                const InstanceValue* iv = inst.valueFor(sym);
                if (iv ? !iv->lockgeom : !ms.lockgeom) return false;
            }
            if (!place[l][size_t(sym)].storage) return false;
            const char* at = prog->initImage.data() + place[l][size_t(sym)].offset;
            const TypeDesc t = symType[l][size_t(sym)];
            if (t == TypeInt)
                value = *reinterpret_cast<const int*>(at) != 0;
            else if (t == TypeFloat)
                value = *reinterpret_cast<const float*>(at) != 0.0f;
            else
                return false;
            return true;
        };
        std::vector<uint8_t> dead(m.ops.size(), 0);
        for (size_t k = 0; k < m.ops.size(); ++k) {
            const MasterOp& op = m.ops[k];
            bool value = false;
            if (dead[k] || op.opname != "if" || op.nargs < 1 ||
                !fixedCondition(m.args[size_t(op.firstArg)], value))
                continue;
            const size_t from = value ? size_t(op.jump[0]) : k + 1;
            const size_t to = value ? size_t(op.jump[1]) : size_t(op.jump[0]);
            for (size_t j = from; j < to && j < dead.size(); ++j) dead[j] = 1;
        }
        bool writesGlobals = false;
        for (size_t k = 0; k < m.ops.size() && !writesGlobals; ++k) {
            const MasterOp& op = m.ops[k];
            for (int a = 0; a < op.nargs && !dead[k]; ++a) {
                const int sym = m.args[size_t(op.firstArg + a)];
                if (sym >= 0 && (op.argWrite & (1u << a)) &&
                    m.symbols[size_t(sym)].symtype == SymTypeGlobal)
                    writesGlobals = true;
            }
        }
        bool feedsOthers = false;
        for (const Connection& c : group.connections)
            if (c.src.layer == l) feedsOthers = true;
        if (writesGlobals && (feedsOthers || !sys.lazyGlobals)) pl.runsEagerly = true;
        if (!sys.lazyLayers) pl.runsEagerly = true;
    }
    for (ustring e : group.entryLayers) {
        const int l = group.findLayer(e);
        if (l < 0) {
            error = "entry layer \"" + e.string() + "\" is not a layer of the group";
            return nullptr;
        }
        if (std::find(prog->entryOrder.begin(), prog->entryOrder.end(), l) ==
            prog->entryOrder.end())
            prog->entryOrder.push_back(l);
    }
    prog->traceLayers = sys.debugLayers != 0;
    prog->debugNan = sys.debugNan != 0;
    prog->debugUninit = sys.debugUninit != 0;
    // Uninitialised-read checks need every op as written, so they run unoptimised.
    if (!prog->debugUninit) {
        OptimizerStats stats;
        optimizeProgram(sys, group, *prog, stats);
        prog->optFolded = stats.folded;
        prog->optRemoved = stats.removed;
        prog->optMergedLayers = stats.mergedLayers;
        found = std::move(stats.neverRun);
    }
    if (prog->debugUninit) {
        markUninitialized(*prog);
        for (int l = 0; l < nlayers; ++l) prog->reportedOps.push_back(reportedOpNumbers(group, l));
    }
    return prog;
}

} // namespace

std::unique_ptr<Program> buildProgram(ShadingSystemImpl& sys, const ShaderGroup& group,
                                      std::string& error) {
    std::vector<std::vector<uint8_t>> neverRun, needs;
    auto prog = buildOnce(sys, group, error, {}, neverRun, needs);
    // Ops in a branch that fixed parameters rule out never run; when they were all that asked
    // for some derivatives, build again without them, so that the values computed are the ones
    // computed without derivatives (as the shader would give were the branch not there).
    if (!prog || neverRun.empty() || derivativeNeeds(group, neverRun) == needs) return prog;
    std::vector<std::vector<uint8_t>> again, againNeeds;
    return buildOnce(sys, group, error, neverRun, again, againNeeds);
}

} // namespace OSL
