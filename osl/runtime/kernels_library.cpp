// The rest of the standard library: regex, split, dictionaries, point clouds, trace.
#include "kernels_registry.h"
#include "text_search.h"
#include "xml_dictionary.h"

#include <algorithm>
#include <vector>

namespace OSL {

namespace {

// ---- strings ----------------------------------------------------------------------------------

// regex_search / regex_match (R, subject, [results,] pattern); iaux is 1 for a whole match.
void kRegex(ExecState& st, const Instr& in) {
    const bool withResults = in.nargs == 4;
    const Operand& pattern = in.args[in.nargs - 1];
    int* results = withResults ? st.i(in.args[2]) : nullptr;
    const int nresults = withResults ? std::max<int>(1, in.args[2].arraylen) : 0;
    std::string error;
    const int r =
        regexFind(*st.s(in.args[1]), *st.s(pattern), in.iaux != 0, results, nresults, error);
    if (r < 0) {
        shaderError(st, in, "Invalid regex \"" + st.s(pattern)->string() + "\": " + error);
        if (results) std::fill(results, results + nresults, 0);
    }
    *st.i(in.args[0]) = r < 0 ? 0 : r;
}

// split (R, string, results[], [sep, [maxsplit]]): sep defaults to whitespace, maxsplit to the
// length of the results array.
void kSplit(ExecState& st, const Instr& in) {
    const Operand& results = in.args[2];
    const int capacity = std::max<int>(1, results.arraylen);
    static const std::string whitespace;
    const std::string& sep = in.nargs > 3 ? st.s(in.args[3])->string() : whitespace;
    const int maxsplit = in.nargs > 4 ? st.integer(in.args[4]) : capacity;
    *st.i(in.args[0]) =
        splitString(st.s(in.args[1])->string(), sep, maxsplit, capacity, st.s(results));
}

// ---- dictionaries ------------------------------------------------------------------------------

void kDictFind(ExecState& st, const Instr& in) {
    XmlDictionary& dict = XmlDictionary::forThisThread();
    const Operand& source = in.args[1];
    const ustring query = *st.s(in.args[2]);
    std::string error;
    const int id = source.isString ? dict.find(*st.s(source), query, error)
                                   : dict.find(st.integer(source), query, error);
    if (!error.empty()) shaderError(st, in, error);
    *st.i(in.args[0]) = id;
}

void kDictNext(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = XmlDictionary::forThisThread().next(st.integer(in.args[1]));
}

void kDictValue(ExecState& st, const Instr& in) {
    const Operand& out = in.args[3];
    const int r = XmlDictionary::forThisThread().value(st.integer(in.args[1]), *st.s(in.args[2]),
                                                       out.type, st.p(out));
    if (r && out.isFloat) st.zeroDerivs(out);
    *st.i(in.args[0]) = r;
}

// ---- point clouds (answered by the renderer services) -------------------------------------------

TypeDesc elementType(const Operand& o) {
    TypeDesc t = o.type;
    t.arraylen = 0;
    return t;
}

// pointcloud_search (R, file, center, radius, maxpoints, [sort,] "attr", array, ...).
void kPointcloudSearch(ExecState& st, const Instr& in) {
    thread_local std::vector<size_t> indices;
    thread_local std::vector<float> distances;
    RendererServices* rs = st.ctx->system->renderer;
    const ustring file = *st.s(in.args[1]);
    const Vec3 center = st.vec(in.args[2]);
    const float radius = st.scalar(in.args[3]);
    int maxPoints = std::max(0, st.integer(in.args[4]));
    int a = 5;
    bool sort = false;
    if (a < in.nargs && !in.args[a].isString) sort = st.integer(in.args[a++]) != 0;
    // Never find more points than any output array holds.
    for (int k = a; k + 1 < in.nargs; k += 2)
        maxPoints = std::min(maxPoints, std::max<int>(1, in.args[k + 1].arraylen));
    indices.assign(size_t(maxPoints), 0);
    distances.assign(size_t(maxPoints), 0.0f);
    int count = 0;
    if (rs && maxPoints > 0)
        count = rs->pointcloud_search(st.sg, file, center, radius, maxPoints, sort, indices.data(),
                                      distances.data(), 0);
    count = std::clamp(count, 0, maxPoints);
    for (int k = a; k + 1 < in.nargs; k += 2) {
        const ustring name = *st.s(in.args[k]);
        const Operand& out = in.args[k + 1];
        if (name == "index" && out.isInt) {
            for (int i = 0; i < count; ++i) st.i(out)[i] = int(indices[size_t(i)]);
        } else if (name == "distance" && out.isFloat) {
            for (int i = 0; i < count; ++i) st.f(out)[i] = distances[size_t(i)];
            st.zeroDerivs(out);
        } else if (count > 0) {
            rs->pointcloud_get(st.sg, file, indices.data(), count, name, elementType(out),
                               st.p(out));
            st.zeroDerivs(out);
        }
    }
    *st.i(in.args[0]) = count;
}

// pointcloud_get (R, file, indices[], count, "attr", data[]).
void kPointcloudGet(ExecState& st, const Instr& in) {
    thread_local std::vector<size_t> indices;
    RendererServices* rs = st.ctx->system->renderer;
    const Operand& idx = in.args[2];
    const Operand& out = in.args[5];
    int count = std::clamp(st.integer(in.args[3]), 0, std::max<int>(1, idx.arraylen));
    count = std::min(count, std::max<int>(1, out.arraylen));
    indices.resize(size_t(count));
    for (int i = 0; i < count; ++i) indices[size_t(i)] = size_t(std::max(0, st.i(idx)[i]));
    int r = 0;
    if (rs)
        r = rs->pointcloud_get(st.sg, *st.s(in.args[1]), indices.data(), count, *st.s(in.args[4]),
                               elementType(out), st.p(out));
    st.zeroDerivs(out);
    *st.i(in.args[0]) = r;
}

// pointcloud_write (R, file, position, "attr", value, ...).
void kPointcloudWrite(ExecState& st, const Instr& in) {
    thread_local std::vector<ustring> names;
    thread_local std::vector<TypeDesc> types;
    thread_local std::vector<const void*> data;
    names.clear(), types.clear(), data.clear();
    for (int k = 3; k + 1 < in.nargs; k += 2) {
        names.push_back(*st.s(in.args[k]));
        types.push_back(in.args[k + 1].type);
        data.push_back(st.p(in.args[k + 1]));
    }
    RendererServices* rs = st.ctx->system->renderer;
    const bool ok =
        rs && rs->pointcloud_write(st.sg, *st.s(in.args[1]), st.vec(in.args[2]), int(names.size()),
                                   names.data(), types.data(), data.data());
    *st.i(in.args[0]) = ok;
}

// ---- trace -------------------------------------------------------------------------------------

// trace (R, position, direction, "option", value, ...).
void kTrace(ExecState& st, const Instr& in) {
    RendererServices::TraceOpt opt;
    for (int k = 3; k + 1 < in.nargs; k += 2) {
        const std::string_view name = st.s(in.args[k])->string();
        const Operand& v = in.args[k + 1];
        if (name == "mindist")
            opt.mindist = st.scalar(v);
        else if (name == "maxdist")
            opt.maxdist = st.scalar(v);
        else if (name == "shade")
            opt.shade = st.integer(v) != 0;
        else if (name == "traceset" && v.isString)
            opt.traceset = *st.s(v);
        else
            shaderError(st, in, "Unknown trace() optional argument: \"" + std::string(name) + "\"");
    }
    const Dual2<Vec3> P = st.dvec(in.args[1]);
    const Dual2<Vec3> D = st.dvec(in.args[2]);
    RendererServices* rs = st.ctx->system->renderer;
    const bool hit = rs && rs->trace(opt, st.sg, P.val(), P.dx(), P.dy(), D.val(), D.dx(), D.dy());
    *st.i(in.args[0]) = hit;
}

} // namespace

int selectLibraryKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const int n = k.nargs();
    if ((op == "regex_search" || op == "regex_match") && (n == 3 || n == 4)) {
        k.in.fn = kRegex;
        k.in.iaux = op == "regex_match";
        return 1;
    }
    if (op == "split" && n >= 3 && n <= 5) return k.in.fn = kSplit, 1;
    if (op == "dict_find" && n == 3) return k.in.fn = kDictFind, 1;
    if (op == "dict_next" && n == 2) return k.in.fn = kDictNext, 1;
    if (op == "dict_value" && n == 4) return k.in.fn = kDictValue, 1;
    if (op == "pointcloud_search" && n >= 5) return k.in.fn = kPointcloudSearch, 1;
    if (op == "pointcloud_get" && n == 6) return k.in.fn = kPointcloudGet, 1;
    if (op == "pointcloud_write" && n >= 3) return k.in.fn = kPointcloudWrite, 1;
    if (op == "trace" && n >= 3) return k.in.fn = kTrace, 1;
    return 0;
}

} // namespace OSL
