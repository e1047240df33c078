// Instance merging: a layer running the same shader with the same values and the same inputs
// as an earlier layer computes the same results, so its readers take the earlier layer's.
#include "optimizer.h"

#include "shading_system_impl.h"

#include <algorithm>
#include <tuple>

namespace OSL {

namespace {

bool sameValues(const ShaderInstance& a, const ShaderInstance& b) {
    if (a.values.size() != b.values.size()) return false;
    for (const InstanceValue& va : a.values) {
        const InstanceValue* vb = b.valueFor(va.symbol);
        if (!vb || vb->type != va.type || vb->lockgeom != va.lockgeom || vb->data != va.data)
            return false;
    }
    return true;
}

using InputKey = std::tuple<int, int, int, int, int, int, int>;

// The layer's incoming connections, with upstream layers named by their merged stand-in.
std::vector<InputKey> inputsOf(const ShaderGroup& group, int layer, const std::vector<int>& rep) {
    std::vector<InputKey> keys;
    for (const Connection& c : group.connections)
        if (c.dst.layer == layer)
            keys.emplace_back(rep[size_t(c.src.layer)], c.src.symbol, c.src.arrayIndex,
                              c.src.component, c.dst.symbol, c.dst.arrayIndex, c.dst.component);
    std::sort(keys.begin(), keys.end());
    return keys;
}

} // namespace

int mergeInstances(ShadingSystemImpl& sys, const ShaderGroup& group, Program& prog) {
    if (!sys.optMergeInstances) return 0;
    const int n = int(prog.layers.size());
    std::vector<int> rep(static_cast<size_t>(n));
    for (int l = 0; l < n; ++l) rep[size_t(l)] = l;
    // Layers that run on their own (entries, renderer outputs, eager ones) keep running.
    auto mergeable = [&](int l) {
        const ProgramLayer& pl = prog.layers[size_t(l)];
        if (pl.runsEagerly || pl.isEntry) return false;
        return pl.userdata.empty() || sys.optMergeInstancesWithUserdata;
    };
    auto sameLayout = [&](int a, int b) {
        const ProgramLayer& pa = prog.layers[size_t(a)];
        const ProgramLayer& pb = prog.layers[size_t(b)];
        if (pa.symbolCount != pb.symbolCount) return false;
        for (int s = 0; s < pa.symbolCount; ++s) {
            const ShaderSymbol& x = prog.symbols[size_t(pa.firstSymbol + s)];
            const ShaderSymbol& y = prog.symbols[size_t(pb.firstSymbol + s)];
            if (x.type != y.type || x.derivs != y.derivs || x.hasStorage != y.hasStorage)
                return false;
        }
        return true;
    };
    int merged = 0;
    for (int j = 1; j < n; ++j) {
        if (!mergeable(j)) continue;
        const ShaderInstance& b = group.layers[size_t(j)];
        const std::vector<InputKey> inputsB = inputsOf(group, j, rep);
        for (int i = 0; i < j; ++i) {
            const ShaderInstance& a = group.layers[size_t(i)];
            if (rep[size_t(i)] != i || !mergeable(i) || a.master != b.master || !sameValues(a, b) ||
                !sameLayout(i, j) || inputsOf(group, i, rep) != inputsB)
                continue;
            rep[size_t(j)] = i;
            ++merged;
            break;
        }
    }
    if (!merged) return 0;
    for (ConnectionCopy& cc : prog.copies) {
        const int to = rep[size_t(cc.srcLayer)];
        if (to == cc.srcLayer) continue;
        const ShaderSymbol& old = prog.symbols[size_t(cc.src.symbol)];
        const int sym = prog.layers[size_t(to)].firstSymbol + old.masterSymbol;
        cc.srcLayer = to;
        cc.src.symbol = sym;
        cc.src.offset = prog.symbols[size_t(sym)].offset;
    }
    return merged;
}

} // namespace OSL
