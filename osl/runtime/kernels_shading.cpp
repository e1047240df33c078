// Shading-specific ops: closures, ray types and other sample state, connection queries,
// attributes from the renderer, messages between layers; and the op table's entry point.
#include "kernels_registry.h"

#include <OSL/dual.h>

namespace OSL {

namespace {

// ---- closures -----------------------------------------------------------------------------------

void kClosure(ExecState& st, const Instr& in) {
    const ClosureEntry& e = *static_cast<const ClosureEntry*>(in.aux);
    const bool weighted = in.iaux;
    const int firstParam = weighted ? 3 : 2;
    auto* comp = static_cast<ClosureComponent*>(
        st.ctx->closures.allocate(sizeof(ClosureComponent) + size_t(e.structSize), 16));
    comp->id = e.id;
    comp->w = weighted ? st.vec(in.args[1]) : Vec3(1.0f);
    char* data = static_cast<char*>(comp->data());
    std::memset(data, 0, size_t(e.structSize));
    int a = firstParam;
    auto copyParam = [&](const ClosureParam& p, const Operand& o) {
        char* dst = data + p.offset;
        const TypeDesc t = p.type;
        if (t.basetype == TypeDesc::STRING && o.isString) {
            std::memcpy(dst, st.p(o), std::min<size_t>(size_t(p.field_size), o.size));
        } else if (t.basetype == TypeDesc::INT || t.basetype == TypeDesc::FLOAT) {
            // Whole values, arrays included; a single number fills every slot.
            const int n = p.field_size / 4;
            const int have = std::max<int>(1, int(o.size / 4));
            for (int c = 0; c < n; ++c) {
                const int from = have == 1 ? 0 : std::min(c, have - 1);
                const float fv = o.isInt ? float(st.i(o)[from]) : st.f(o)[from];
                if (t.basetype == TypeDesc::INT)
                    reinterpret_cast<int*>(dst)[c] = o.isInt ? st.i(o)[from] : int(fv);
                else
                    reinterpret_cast<float*>(dst)[c] = fv;
            }
        } else if (t.basetype == TypeDesc::PTR && o.isClosure) {
            std::memcpy(dst, st.p(o), sizeof(void*));
        }
    };
    for (const ClosureParam& p : e.params) {
        if (p.key) continue;
        if (a >= in.nargs) break;
        copyParam(p, in.args[a++]);
    }
    // Keyword arguments follow as (name, value) pairs.
    for (; a + 1 < in.nargs; a += 2) {
        const ustring key = *st.s(in.args[a]);
        for (const ClosureParam& p : e.params)
            if (p.key && key == p.key) copyParam(p, in.args[a + 1]);
    }
    *st.c(in.args[0]) = comp;
}

void kClosureMul(ExecState& st, const Instr& in) {
    const Operand& A = in.args[1];
    const Operand& B = in.args[2];
    const ClosureColor* c = A.isClosure ? *st.c(A) : *st.c(B);
    const Operand& w = A.isClosure ? B : A;
    const Vec3 weight(st.comp(w, 0), st.comp(w, 1), st.comp(w, 2));
    if (!c || weight == Vec3(0.0f)) {
        *st.c(in.args[0]) = nullptr;
        return;
    }
    if (weight == Vec3(1.0f)) {
        *st.c(in.args[0]) = c;
        return;
    }
    auto* m = static_cast<ClosureMul*>(st.ctx->closures.allocate(sizeof(ClosureMul), 16));
    m->id = ClosureColor::MUL;
    m->weight = Color3(weight.x, weight.y, weight.z);
    m->closure = c;
    *st.c(in.args[0]) = m;
}
void kClosureAdd(ExecState& st, const Instr& in) {
    const ClosureColor* a = *st.c(in.args[1]);
    const ClosureColor* b = *st.c(in.args[2]);
    if (!a || !b) {
        *st.c(in.args[0]) = a ? a : b;
        return;
    }
    auto* s = static_cast<ClosureAdd*>(st.ctx->closures.allocate(sizeof(ClosureAdd), 16));
    s->id = ClosureColor::ADD;
    s->closureA = a;
    s->closureB = b;
    *st.c(in.args[0]) = s;
}
void kClosureClear(ExecState& st, const Instr& in) {
    *st.c(in.args[0]) = nullptr;
}

// ---- sample state
// ---------------------------------------------------------------------------------

void kRaytype(ExecState& st, const Instr& in) {
    int bit = in.iaux;
    if (bit < 0) {
        bit = 0;
        const ustring name = *st.s(in.args[1]);
        const auto& types = st.ctx->system->raytypes;
        for (size_t k = 0; k < types.size(); ++k)
            if (types[k] == name) bit = 1 << k;
    }
    *st.i(in.args[0]) = (st.sg->raytype & bit) != 0;
}
void kBackfacing(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = st.sg->backfacing;
}
void kSurfacearea(ExecState& st, const Instr& in) {
    st.store(in.args[0], 0, Dual2<float>(st.sg->surfacearea));
}
void kConstantInt(ExecState& st, const Instr& in) {
    *st.i(in.args[0]) = in.iaux;
}
void kNop(ExecState&, const Instr&) {}

// ---- attributes
// -------------------------------------------------------------------------------------

void kGetattribute(ExecState& st, const Instr& in) {
    // Forms: (R, name, dest), (R, object, name, dest), (R, name, index, dest),
    // (R, object, name, index, dest).
    const Operand& R = in.args[0];
    const Operand& dest = in.args[in.nargs - 1];
    const bool indexed = in.args[in.nargs - 2].isInt;
    const int nameArg = (in.nargs - (indexed ? 1 : 0)) == 4 ? 2 : 1;
    const ustring object = nameArg == 2 ? *st.s(in.args[1]) : ustring();
    const ustring name = *st.s(in.args[nameArg]);
    const int index = indexed ? *st.i(in.args[in.nargs - 2]) : -1;
    TypeDesc type = dest.type;
    if (indexed) type = type.elementtype();
    ShadingSystemImpl& sys = *st.ctx->system;
    const ShaderGroup& g = *st.prog->group;
    bool ok = false;
    void* val = st.p(dest);
    if (object.empty() && !indexed) {
        const std::string_view n = name.string();
        auto putString = [&](ustring s) {
            if (type == TypeString) *static_cast<ustring*>(val) = s, ok = true;
        };
        if (n == "osl:version") {
            if (type == TypeInt) *static_cast<int*>(val) = OSL_VERSION, ok = true;
        } else if (n == "shader:shadername") {
            putString(g.layers[in.layer].master->name);
        } else if (n == "shader:layername") {
            putString(g.layers[in.layer].layername);
        } else if (n == "shader:groupname") {
            putString(g.name);
        } else {
            ok = sys.renderer &&
                 sys.renderer->get_attribute(st.sg, dest.derivs, object, type, name, val);
        }
    } else if (sys.renderer) {
        if (indexed) {
            const uint32_t elem = dest.size / std::max<int>(1, dest.arraylen);
            val = st.heap + dest.offset + uint32_t(std::max(0, index)) * elem;
            ok = sys.renderer->get_array_attribute(st.sg, false, object, type, name, index, val);
        } else {
            ok = sys.renderer->get_attribute(st.sg, dest.derivs, object, type, name, val);
        }
    }
    if (!ok || !dest.derivs || indexed) {
        if (dest.derivs && !indexed) st.zeroDerivs(dest);
    }
    *st.i(R) = ok;
}

// ---- messages
// ---------------------------------------------------------------------------------------

const MasterOp& sourceOf(const ExecState& st, const Instr& in) {
    return st.prog->group->layers[size_t(in.layer)].master->ops[size_t(in.masterOp)];
}

std::string where(const ustring& file, int line) {
    return file.string() + ":" + std::to_string(line);
}

MessageRecord* findMessage(ShadingContext& ctx, ustring name) {
    for (MessageRecord& m : ctx.messages)
        if (m.live && m.name == name) return &m;
    return nullptr;
}

MessageRecord& newMessage(ShadingContext& ctx) {
    for (MessageRecord& m : ctx.messages)
        if (!m.live) return m;
    ctx.messages.emplace_back();
    return ctx.messages.back();
}

std::string typeName(TypeDesc t) {
    return t.basetype == TypeDesc::PTR ? std::string("closure color") : std::string(t.c_str());
}

void kSetmessage(ExecState& st, const Instr& in) {
    const ustring name = *st.s(in.args[0]);
    const Operand& v = in.args[1];
    ShadingContext& ctx = *st.ctx;
    const MasterOp& op = sourceOf(st, in);
    if (MessageRecord* old = findMessage(ctx, name)) {
        if (old->queriedOnly)
            shaderError(st, in,
                        "message \"" + name.string() +
                            "\" was queried before being set (queried here: " +
                            where(old->file, old->line) + ") setting it now (" +
                            where(op.sourcefile, op.line) + ") would lead to inconsistent results");
        else
            shaderError(st, in,
                        "message \"" + name.string() +
                            "\" already exists (created here: " + where(old->file, old->line) +
                            ") cannot set again from " + where(op.sourcefile, op.line));
        return;
    }
    MessageRecord& rec = newMessage(ctx);
    rec.live = true;
    rec.queriedOnly = false;
    rec.name = name;
    rec.type = v.type;
    rec.layer = in.layer;
    rec.derivs = v.derivs;
    rec.file = op.sourcefile;
    rec.line = op.line;
    rec.data.assign(st.heap + v.offset, st.heap + v.offset + v.size * (v.derivs ? 3 : 1));
}

void kGetmessage(ExecState& st, const Instr& in) {
    const bool hasSource = in.nargs == 4;
    const ustring source = hasSource ? *st.s(in.args[1]) : ustring();
    const ustring name = *st.s(in.args[hasSource ? 2 : 1]);
    const Operand& dest = in.args[in.nargs - 1];
    ShadingContext& ctx = *st.ctx;
    if (!source.empty()) {
        ShadingSystemImpl& sys = *ctx.system;
        const bool ok = sys.renderer && sys.renderer->getmessage(st.sg, source, name, dest.type,
                                                                 st.p(dest), dest.derivs);
        *st.i(in.args[0]) = ok;
        return;
    }
    const MasterOp& op = sourceOf(st, in);
    MessageRecord* m = findMessage(ctx, name);
    if (!m) {
        MessageRecord& rec = newMessage(ctx);
        rec.live = true;
        rec.queriedOnly = true;
        rec.name = name;
        rec.file = op.sourcefile;
        rec.line = op.line;
        *st.i(in.args[0]) = 0;
        return;
    }
    if (m->queriedOnly) {
        *st.i(in.args[0]) = 0;
        return;
    }
    if (m->type != dest.type) {
        shaderError(st, in,
                    "type mismatch for message \"" + name.string() + "\" (created as " +
                        typeName(m->type) + " here: " + where(m->file, m->line) +
                        ") cannot fetch as " + typeName(dest.type) + " from " +
                        where(op.sourcefile, op.line));
        *st.i(in.args[0]) = 0;
        return;
    }
    std::memcpy(st.p(dest), m->data.data(), dest.size);
    if (dest.derivs) {
        if (m->derivs)
            std::memcpy(st.heap + dest.offset + dest.size, m->data.data() + dest.size,
                        2 * dest.size);
        else
            st.zeroDerivs(dest);
    }
    *st.i(in.args[0]) = 1;
}

bool isFlowOp(std::string_view op, Flow& flow) {
    static const std::pair<const char*, Flow> table[] = {{"if", Flow::If},
                                                         {"for", Flow::For},
                                                         {"while", Flow::While},
                                                         {"dowhile", Flow::DoWhile},
                                                         {"functioncall", Flow::FunctionCall},
                                                         {"functioncall_nr", Flow::FunctionCall},
                                                         {"return", Flow::Return},
                                                         {"break", Flow::Break},
                                                         {"continue", Flow::Continue},
                                                         {"exit", Flow::Exit},
                                                         {"end", Flow::End}};
    for (const auto& e : table)
        if (op == e.first) {
            flow = e.second;
            return true;
        }
    return false;
}

} // namespace

int selectShadingKernel(KernelChoice& k) {
    const std::string_view op = k.op.string();
    const int n = k.nargs();
    if (op == "closure" && n >= 2) {
        const bool weighted = !k.arg(1).isString;
        const Operand& nameOp = k.arg(weighted ? 2 : 1);
        if (!nameOp.isString || !nameOp.isConst)
            return k.fail("closure name is not a constant"), -1;
        const ustring name =
            *reinterpret_cast<const ustring*>(k.prog.initImage.data() + nameOp.offset);
        const ClosureEntry* e = k.sys.findClosure(name);
        if (!e)
            return k.fail("Closure '" + name.string() +
                          "' is not supported by the current renderer"),
                   -1;
        k.in.fn = kClosure;
        k.in.aux = e;
        k.in.iaux = weighted;
        return 1;
    }
    if (n == 3 && k.arg(0).isClosure) {
        if (op == "mul") return k.in.fn = kClosureMul, 1;
        if (op == "add") return k.in.fn = kClosureAdd, 1;
    }
    if (op == "assign" && n == 2 && k.arg(0).isClosure && !k.arg(1).isClosure)
        return k.in.fn = kClosureClear, 1;
    if (op == "raytype" && n == 2) {
        k.in.fn = kRaytype;
        k.in.iaux = -1;
        if (k.arg(1).isConst) {
            const ustring name =
                *reinterpret_cast<const ustring*>(k.prog.initImage.data() + k.arg(1).offset);
            k.in.iaux = 0;
            for (size_t t = 0; t < k.sys.raytypes.size(); ++t)
                if (k.sys.raytypes[t] == name) k.in.iaux = 1 << t;
        }
        return 1;
    }
    if (op == "backfacing" && n == 1) return k.in.fn = kBackfacing, 1;
    if (op == "surfacearea" && n == 1) return k.in.fn = kSurfacearea, 1;
    if (op == "isconnected" && n == 2) {
        const ShaderSymbol& sym = k.prog.symbols[size_t(k.arg(1).symbol)];
        int r = 0;
        for (const Connection& c : k.prog.group->connections) {
            if (c.dst.layer == sym.layer && c.dst.symbol == sym.masterSymbol) r |= 1;
            if (c.src.layer == sym.layer && c.src.symbol == sym.masterSymbol) r |= 2;
        }
        k.in.fn = kConstantInt;
        k.in.iaux = r;
        return 1;
    }
    if (op == "isconstant" && n == 2) {
        k.in.fn = kConstantInt;
        k.in.iaux = k.arg(1).isConst;
        return 1;
    }
    if (op == "getattribute" && n >= 3 && n <= 5) return k.in.fn = kGetattribute, 1;
    if (op == "setmessage" && n == 2) return k.in.fn = kSetmessage, 1;
    if (op == "getmessage" && (n == 3 || n == 4)) return k.in.fn = kGetmessage, 1;
    if (op == "nop" || op == "useparam") return k.in.fn = kNop, 1;
    return 0;
}

bool selectKernel(ShadingSystemImpl& sys, Program& prog, Instr& in, ustring opname,
                  std::string& error) {
    Flow flow;
    if (isFlowOp(opname.string(), flow)) {
        in.flow = flow;
        in.fn = kNop;
        return true;
    }
    KernelChoice k{sys, prog, in, opname, error};
    for (auto family : {selectShadingKernel, selectMathKernel, selectDataKernel, selectStringKernel,
                        selectNoiseKernel, selectGaborKernel, selectSplineKernel, selectColorKernel,
                        selectTextureKernel, selectLibraryKernel}) {
        const int r = family(k);
        if (r > 0) return true;
        if (r < 0) return false;
    }
    error = "unsupported op \"" + opname.string() + "\" with these argument types";
    return false;
}

} // namespace OSL
