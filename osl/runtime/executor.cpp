// The interpreter: walks a program's instructions, runs layers (entry layers eagerly, upstream
// layers lazily at the first read of a connected input) and copies values along connections.
#include "debug_checks.h"
#include "shading_context.h"
#include "shading_system_impl.h"

#include <algorithm>
#include <cstdlib>

namespace OSL {

void* ClosureArena::allocate(size_t size, size_t align) {
    if (size > kChunk / 4) {
        m_large.emplace_back(new char[size + align]);
        char* p = m_large.back().get();
        return p + (align - reinterpret_cast<uintptr_t>(p) % align) % align;
    }
    for (;;) {
        if (m_chunk == m_chunks.size()) m_chunks.emplace_back(new char[kChunk]);
        char* base = m_chunks[m_chunk].get();
        size_t start = (m_used + align - 1) / align * align;
        start += (align - reinterpret_cast<uintptr_t>(base + start) % align) % align;
        if (start + size <= kChunk) {
            m_used = start + size;
            return base + start;
        }
        ++m_chunk;
        m_used = 0;
    }
}

void ShadingContext::bind(const Program& prog) {
    heapStorage.assign(prog.heapSize + 64, 0);
    char* base = heapStorage.data();
    heap = base + (64 - reinterpret_cast<uintptr_t>(base) % 64) % 64;
    std::memcpy(heap, prog.initImage.data(), prog.initImage.size());
    layerRan.assign(prog.layers.size(), 0);
    paramResolved.assign(prog.connectedParams.size(), 0);
    boundSerial = prog.serial;
}

namespace {

bool condition(const ExecState& st, const Operand& o) {
    if (o.isInt) return *st.i(o) != 0;
    if (o.isFloat) return *st.f(o) != 0.0f;
    if (o.isString) return !st.s(o)->empty();
    if (o.isClosure) return *st.c(o) != nullptr;
    return true;
}

// Copies one plane (value, d/dx or d/dy) of a connection, converting between int, float and
// triples and selecting an array element or a component on either side.
void copyPlane(ExecState& st, const ConnectionCopy& cc, int plane) {
    const Operand& s = cc.src;
    const Operand& d = cc.dst;
    if (plane && !d.derivs) return;
    char* dbase = st.heap + d.offset + plane * d.size;
    if (plane && !s.derivs) {
        // Upstream has no derivatives: the downstream part gets zero ones.
        if (d.isFloat) {
            int elems = std::max<int>(1, d.arraylen);
            int n = d.ncomp, first = 0;
            if (cc.dstArrayIndex >= 0) first = cc.dstArrayIndex * d.ncomp, elems = 1;
            if (cc.dstComponent >= 0) first += cc.dstComponent, n = 1;
            std::memset(dbase + first * 4, 0, size_t(elems) * n * 4);
        }
        return;
    }
    const char* sbase = st.heap + s.offset + plane * s.size;
    const bool wholeS = cc.srcArrayIndex < 0 && cc.srcComponent < 0;
    const bool wholeD = cc.dstArrayIndex < 0 && cc.dstComponent < 0;
    if (wholeS && wholeD && s.size == d.size && s.type.basetype == d.type.basetype) {
        std::memcpy(dbase, sbase, d.size);
        return;
    }
    if (d.isString || s.isString || d.isClosure || s.isClosure) {
        if (!plane) std::memcpy(dbase, sbase, std::min(s.size, d.size));
        return;
    }
    // Numeric: source view.
    int sFirst = 0, sN = s.ncomp;
    if (cc.srcArrayIndex >= 0) sFirst = cc.srcArrayIndex * s.ncomp;
    if (cc.srcComponent >= 0) sFirst += cc.srcComponent, sN = 1;
    int dFirst = 0, dN = d.ncomp, dElems = std::max<int>(1, d.arraylen);
    if (cc.dstArrayIndex >= 0) dFirst = cc.dstArrayIndex * d.ncomp, dElems = 1;
    if (cc.dstComponent >= 0) dFirst += cc.dstComponent, dN = 1;
    int sElems = (cc.srcArrayIndex >= 0 || cc.srcComponent >= 0) ? 1 : std::max<int>(1, s.arraylen);
    for (int e = 0; e < dElems; ++e) {
        const int se = std::min(e, sElems - 1);
        for (int c = 0; c < dN; ++c) {
            const int sc = sFirst + se * s.ncomp + (sN == 1 ? 0 : std::min(c, sN - 1));
            const int dc = dFirst + e * d.ncomp + c;
            float v = s.isInt ? float(reinterpret_cast<const int*>(sbase)[sc])
                              : reinterpret_cast<const float*>(sbase)[sc];
            if (d.isInt)
                reinterpret_cast<int*>(dbase)[dc] = int(v);
            else
                reinterpret_cast<float*>(dbase)[dc] = v;
        }
    }
}

} // namespace

void resolveUses(ExecState& st, const Instr& in) {
    const Program& prog = *st.prog;
    ShadingContext& ctx = *st.ctx;
    for (int u = 0; u < in.useCount; ++u) {
        const int k = prog.uses[in.useBegin + u];
        if (ctx.paramResolved[k]) continue;
        ctx.paramResolved[k] = 1;
        for (int ci : prog.connectedParams[k].sources) {
            const ConnectionCopy& cc = prog.copies[ci];
            if (!ctx.layerRan[cc.srcLayer]) runLayer(st, cc.srcLayer);
            for (int plane = 0; plane < 3; ++plane) copyPlane(st, cc, plane);
        }
    }
}

namespace {

// One line of the layer trace, kept in order with the shader's own output.
void traceLayer(ExecState& st, const char* what, int layer) {
    const ShaderInstance& inst = st.prog->group->layers[size_t(layer)];
    std::string& out = st.ctx->output;
    out += "(node ";
    out += inst.layername.string();
    out += ") ";
    out += what;
    out += ' ';
    out += std::to_string(layer);
    out += ' ';
    out += inst.layername.string();
    out += ' ';
    out += inst.master->name.string();
    out += '\n';
}

} // namespace

void runLayer(ExecState& st, int layer) {
    ShadingContext& ctx = *st.ctx;
    const Program& prog = *st.prog;
    const ProgramLayer& pl = prog.layers[layer];
    if (prog.traceLayers && pl.isEntry) {
        traceLayer(st, "checking for already-run layer", layer);
        if (ctx.layerRan[layer])
            traceLayer(st, "  taking early exit, already executed layer", layer);
    }
    if (ctx.layerRan[layer]) return;
    ctx.layerRan[layer] = 1;
    if (prog.traceLayers) traceLayer(st, "enter layer", layer);
    // The group's entry (its last layer unless entries are named) first runs the layers that
    // always run, then its own code.
    if (prog.entryOrder.empty() && layer == int(prog.layers.size()) - 1)
        for (size_t l = 0; l + 1 < prog.layers.size(); ++l)
            if (prog.layers[l].runsEagerly && !ctx.layerRan[l]) runLayer(st, int(l));
    std::memcpy(st.heap + pl.regionBegin, prog.initImage.data() + pl.regionBegin,
                pl.regionEnd - pl.regionBegin);
    if (!pl.userdata.empty()) {
        RendererServices* rs = ctx.system->renderer;
        for (const UserdataParam& u : pl.userdata)
            if (rs && !rs->get_userdata(u.value.derivs, u.name, u.value.type, st.sg, st.p(u.value)))
                std::memcpy(st.p(u.value), prog.initImage.data() + u.value.offset,
                            u.value.size * (u.value.derivs ? 3 : 1));
    }
    const uint8_t savedStatus = ctx.status;
    const int savedLayer = ctx.currentLayer;
    ctx.currentLayer = layer;
    for (const auto& r : pl.initRanges) {
        ctx.status = Running;
        runRange(st, r.first, r.second);
    }
    ctx.status = Running;
    runRange(st, pl.mainBegin, pl.mainEnd);
    ctx.status = savedStatus;
    ctx.currentLayer = savedLayer;
    if (prog.traceLayers) traceLayer(st, "exit layer", layer);
}

void runRange(ExecState& st, int begin, int end) {
    const Instr* instrs = st.prog->instrs.data();
    ShadingContext& ctx = *st.ctx;
    for (int ip = begin; ip < end;) {
        const Instr& in = instrs[ip];
        if (in.useCount) resolveUses(st, in);
        switch (in.flow) {
        case Flow::Plain:
            if (st.prog->debugUninit) [[unlikely]]
                checkUninitializedReads(st, in);
            in.fn(st, in);
            if (st.prog->debugNan) [[unlikely]]
                checkNonFiniteWrites(st, in);
            ++ip;
            break;
        case Flow::If:
            if (condition(st, in.args[0]))
                runRange(st, ip + 1, in.jump[0]);
            else
                runRange(st, in.jump[0], in.jump[1]);
            if (ctx.status) return;
            ip = in.jump[1];
            break;
        case Flow::For:
        case Flow::While:
        case Flow::DoWhile: {
            const bool bodyFirst = in.flow == Flow::DoWhile;
            runRange(st, ip + 1, in.jump[0]);
            if (ctx.status) return;
            for (;;) {
                if (!bodyFirst) {
                    runRange(st, in.jump[0], in.jump[1]);
                    if (ctx.status) return;
                    if (!condition(st, in.args[0])) break;
                }
                runRange(st, in.jump[1], in.jump[2]);
                if (ctx.status & Broke) {
                    ctx.status &= ~Broke;
                    break;
                }
                ctx.status &= ~Continued;
                if (ctx.status) return;
                runRange(st, in.jump[2], in.jump[3]);
                if (ctx.status) return;
                if (bodyFirst) {
                    runRange(st, in.jump[0], in.jump[1]);
                    if (ctx.status) return;
                    if (!condition(st, in.args[0])) break;
                }
            }
            ip = in.jump[3];
            break;
        }
        case Flow::FunctionCall:
            runRange(st, ip + 1, in.jump[0]);
            ctx.status &= ~Returned;
            if (ctx.status) return;
            ip = in.jump[0];
            break;
        case Flow::Return:
            ctx.status |= Returned;
            return;
        case Flow::Break:
            ctx.status |= Broke;
            return;
        case Flow::Continue:
            ctx.status |= Continued;
            return;
        case Flow::Exit:
            ctx.status |= Exited;
            return;
        case Flow::End:
            return;
        }
    }
}

void reportContextError(ShadingContext& ctx, const std::string& msg, bool isError) {
    ShadingSystemImpl& sys = *ctx.system;
    if (!sys.errorRepeats) {
        if (std::find(ctx.errorsSeen.begin(), ctx.errorsSeen.end(), msg) != ctx.errorsSeen.end())
            return;
        ctx.errorsSeen.push_back(msg);
    }
    if (!ctx.output.empty()) {
        sys.message(ctx.output);
        ctx.output.clear();
    }
    if (isError)
        sys.error(msg);
    else
        sys.warning(msg);
}

void shaderError(ExecState& st, const Instr&, const std::string& msg) {
    reportContextError(*st.ctx, msg);
}

namespace {

void loadGlobals(ExecState& st, const ShaderGlobals& sg) {
    for (const GlobalSlot& g : st.prog->globals) {
        float* d = reinterpret_cast<float*>(st.heap + g.offset);
        auto put3 = [&](const Vec3& v, const Vec3& dx, const Vec3& dy) {
            d[0] = v.x, d[1] = v.y, d[2] = v.z;
            if (g.derivs)
                d[3] = dx.x, d[4] = dx.y, d[5] = dx.z, d[6] = dy.x, d[7] = dy.y, d[8] = dy.z;
        };
        auto put1 = [&](float v, float dx, float dy) {
            d[0] = v;
            if (g.derivs) d[1] = dx, d[2] = dy;
        };
        const Vec3 z(0.0f);
        switch (g.id) {
        case GlobalId::P:
            put3(sg.P, sg.dPdx, sg.dPdy);
            break;
        case GlobalId::I:
            put3(sg.I, sg.dIdx, sg.dIdy);
            break;
        case GlobalId::N:
            put3(sg.N, z, z);
            break;
        case GlobalId::Ng:
            put3(sg.Ng, z, z);
            break;
        case GlobalId::u:
            put1(sg.u, sg.dudx, sg.dudy);
            break;
        case GlobalId::v:
            put1(sg.v, sg.dvdx, sg.dvdy);
            break;
        case GlobalId::dPdu:
            put3(sg.dPdu, z, z);
            break;
        case GlobalId::dPdv:
            put3(sg.dPdv, z, z);
            break;
        case GlobalId::Ps:
            put3(sg.Ps, sg.dPsdx, sg.dPsdy);
            break;
        case GlobalId::time:
            put1(sg.time, 0, 0);
            break;
        case GlobalId::dtime:
            put1(sg.dtime, 0, 0);
            break;
        case GlobalId::dPdtime:
            put3(sg.dPdtime, z, z);
            break;
        case GlobalId::Ci:
            *reinterpret_cast<const ClosureColor**>(st.heap + g.offset) = sg.Ci;
            break;
        case GlobalId::Other:
            break;
        }
    }
}

} // namespace

bool ShadingSystemImpl::executeInit(ShadingContext& ctx, ShaderGroup& group, ShaderGlobals& sg,
                                    bool run) {
    if (!group.program) {
        error("execute: shader group \"" + group.name.string() + "\" is not ready to run" +
              (group.buildError.empty() ? std::string() : ": " + group.buildError));
        ctx.prog = nullptr;
        return false;
    }
    const Program& prog = *group.program;
    if (ctx.boundSerial != prog.serial) ctx.bind(prog);
    ctx.prog = &prog;
    std::fill(ctx.layerRan.begin(), ctx.layerRan.end(), 0);
    std::fill(ctx.paramResolved.begin(), ctx.paramResolved.end(), 0);
    ctx.closures.reset();
    for (MessageRecord& m : ctx.messages) m.live = false;
    ctx.sg = &sg;
    ctx.status = Running;
    sg.context = &ctx;
    if (run) {
        ExecState st{ctx.heap, &ctx, &sg, &prog};
        loadGlobals(st, sg);
    }
    return true;
}

bool ShadingSystemImpl::executeLayer(ShadingContext& ctx, int layer) {
    if (!ctx.prog || layer < 0 || layer >= int(ctx.prog->layers.size())) return false;
    ExecState st{ctx.heap, &ctx, ctx.sg, ctx.prog};
    runLayer(st, layer);
    return true;
}

bool ShadingSystemImpl::executeCleanup(ShadingContext& ctx) {
    if (!ctx.prog) return false;
    if (ctx.prog->hasCi && ctx.sg)
        ctx.sg->Ci = *reinterpret_cast<ClosureColor**>(ctx.heap + ctx.prog->ciOffset);
    if (!ctx.output.empty()) {
        message(ctx.output);
        ctx.output.clear();
    }
    return true;
}

bool ShadingSystemImpl::execute(ShadingContext& ctx, ShaderGroup& group, ShaderGlobals& sg,
                                bool run) {
    if (!executeInit(ctx, group, sg, run)) return false;
    if (!run) return true;
    const Program& prog = *ctx.prog;
    if (prog.entryOrder.empty()) {
        executeLayer(ctx, int(prog.layers.size()) - 1);
    } else {
        for (int l : prog.entryOrder) executeLayer(ctx, l);
    }
    return executeCleanup(ctx);
}

} // namespace OSL
