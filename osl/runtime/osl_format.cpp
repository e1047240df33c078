// Formatting of shader values for printf, format, error, warning and fprintf.
#include "osl_format.h"
#include "shading_system_impl.h"

#include <cstdio>
#include <cstring>

namespace OSL {

namespace {

void appendf(std::string& out, const char* spec, auto value) {
    char buf[256];
    int n = std::snprintf(buf, sizeof buf, spec, value);
    if (n < 0) return;
    if (size_t(n) < sizeof buf) {
        out.append(buf, size_t(n));
    } else {
        std::string big(size_t(n) + 1, '\0');
        std::snprintf(big.data(), big.size(), spec, value);
        out.append(big.data(), size_t(n));
    }
}

bool isIntConversion(char c) {
    return c == 'd' || c == 'i' || c == 'o' || c == 'x' || c == 'X' || c == 'u' || c == 'c';
}

void formatScalar(std::string& out, const std::string& spec, char conv, const ExecState& st,
                  const Operand& o, int index) {
    if (o.isString) {
        const ustring s = st.s(o)[index];
        std::string sp = spec;
        sp.back() = 's';
        appendf(out, sp.c_str(), s.c_str());
        return;
    }
    if (o.isClosure) {
        std::string text;
        formatClosure(st.c(o)[index], *st.ctx->system, text);
        std::string sp = spec;
        sp.back() = 's';
        appendf(out, sp.c_str(), text.c_str());
        return;
    }
    if (o.isInt) {
        const int v = st.i(o)[index];
        if (isIntConversion(conv)) {
            appendf(out, spec.c_str(), v);
        } else if (conv == 's') {
            appendf(out, "%d", v);
        } else {
            appendf(out, spec.c_str(), double(v));
        }
        return;
    }
    const float v = st.f(o)[index];
    if (isIntConversion(conv)) {
        appendf(out, spec.c_str(), int(v));
    } else if (conv == 's') {
        appendf(out, "%g", double(v));
    } else {
        appendf(out, spec.c_str(), double(v));
    }
}

} // namespace

namespace {

void formatClosureParam(const ClosureParam& p, const char* data, std::string& out) {
    char buf[64];
    const TypeDesc t = p.type;
    const char* at = data + p.offset;
    const int elems = std::max(1, t.arraylen);
    const TypeDesc el = t.elementtype();
    if (t.arraylen > 0) out += "[";
    for (int e = 0; e < elems; ++e) {
        if (e) out += ", ";
        if (el.basetype == TypeDesc::STRING) {
            out += "\"";
            out += reinterpret_cast<const ustring*>(at)[e].string();
            out += "\"";
        } else if (el.basetype == TypeDesc::INT) {
            out += std::to_string(reinterpret_cast<const int*>(at)[e]);
        } else if (el.basetype == TypeDesc::FLOAT) {
            const int n = int(el.aggregate);
            const float* f = reinterpret_cast<const float*>(at) + e * n;
            if (n > 1) out += "(";
            for (int k = 0; k < n; ++k) {
                std::snprintf(buf, sizeof buf, "%s%g", k ? ", " : "", double(f[k]));
                out += buf;
            }
            if (n > 1) out += ")";
        }
    }
    if (t.arraylen > 0) out += "]";
}

void formatClosureTree(const ClosureColor* c, const ShadingSystemImpl& sys, const Color3& w,
                       std::string& out) {
    if (!c) return;
    if (c->id == ClosureColor::ADD) {
        formatClosureTree(c->as_add()->closureA, sys, w, out);
        out += "\n\t+ ";
        formatClosureTree(c->as_add()->closureB, sys, w, out);
        return;
    }
    if (c->id == ClosureColor::MUL) {
        formatClosureTree(c->as_mul()->closure, sys, w * c->as_mul()->weight, out);
        return;
    }
    const ClosureComponent* comp = c->as_comp();
    char buf[128];
    std::snprintf(buf, sizeof buf, "(%g, %g, %g) * ", double(w.x * comp->w.x),
                  double(w.y * comp->w.y), double(w.z * comp->w.z));
    out += buf;
    const ClosureEntry* entry = nullptr;
    for (const ClosureEntry& e : sys.closures)
        if (e.id == c->id) entry = &e;
    if (!entry) {
        out += "unknown ()";
        return;
    }
    out += entry->name.string();
    out += " (";
    const char* data = static_cast<const char*>(comp->data());
    bool first = true;
    for (const ClosureParam& p : entry->params) {
        if (!first) out += ", ";
        first = false;
        if (p.key) {
            out += "\"";
            out += p.key;
            out += "\", ";
        }
        formatClosureParam(p, data, out);
    }
    out += ")";
}

} // namespace

void formatClosure(const ClosureColor* c, const ShadingSystemImpl& sys, std::string& out) {
    formatClosureTree(c, sys, Color3(1.0f), out);
}

void oslFormat(const ExecState& st, ustring fmt, const Operand* args, int nargs, std::string& out) {
    const char* f = fmt.c_str();
    if (!f) return;
    int next = 0;
    while (*f) {
        if (*f != '%') {
            out += *f++;
            continue;
        }
        if (f[1] == '%') {
            out += '%';
            f += 2;
            continue;
        }
        const char* start = f++;
        while (*f && std::strchr("-+ #0123456789.lhLjzt", *f)) ++f;
        if (!*f) {
            out.append(start);
            break;
        }
        const char conv = *f++;
        std::string spec;
        for (const char* p = start; p < f - 1; ++p)
            if (*p != 'l' && *p != 'h' && *p != 'L' && *p != 'j' && *p != 'z' && *p != 't')
                spec += *p;
        spec += conv;
        if (next >= nargs) {
            out.append(start, f);
            continue;
        }
        const Operand& o = args[next++];
        const int elems = std::max<int>(1, o.arraylen);
        const int comps = o.ncomp;
        for (int e = 0; e < elems; ++e)
            for (int c = 0; c < comps; ++c) {
                if (e || c) out += ' ';
                formatScalar(out, spec, conv, st, o, e * comps + c);
            }
    }
}

} // namespace OSL
