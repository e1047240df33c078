// OSO text in the layout oslc writes: header, symbols with hints, code sections, ops.
#include "oso_writer.h"

#include "codegen.h"

#include <algorithm>
#include <set>
#include <sstream>

namespace OSL::pvt {

namespace {

bool localOrTemp(const Symbol* s) {
    return s->symtype == SymTypeLocal || s->symtype == SymTypeTemp;
}

// Read/write ranges per symbol. Inside a loop, a value may flow from one iteration to the next,
// so the range of a local or temporary used there is stretched over the loop.
void computeLifetimes(ShaderUnit& u) {
    for (Symbol* s : u.symbols) {
        s->readFirst = s->writeFirst = INT_MAX;
        s->readLast = s->writeLast = -1;
    }
    auto mark = [](Symbol* s, int op, bool r, bool w) {
        if (r) s->markRead(op);
        if (w) s->markWrite(op);
        if (s->structParent && (r || w)) {
            // Keep the parent marked used so that its declaration survives.
        }
    };
    std::vector<std::pair<int, int>> loops;
    for (int i = 0; i < int(u.ops.size()); ++i) {
        while (!loops.empty() && loops.back().second < i) loops.pop_back();
        Op& op = u.ops[i];
        bool isLoop = (op.name == "for" || op.name == "while" || op.name == "dowhile") &&
                      op.jumps.size() == 4;
        for (size_t a = 0; a < op.args.size(); ++a) {
            Symbol* s = op.args[a];
            if (!s) continue;
            bool r = op.rw[a] == 'r' || op.rw[a] == 'W';
            bool w = op.rw[a] == 'w' || op.rw[a] == 'W';
            mark(s, i, r, w);
            if (!localOrTemp(s)) continue;
            for (auto& lb : loops) {
                int first = std::min(s->readFirst, s->writeFirst);
                if (first < lb.first) {
                    mark(s, lb.second, r, w);
                } else {
                    mark(s, lb.first, r, w);
                    mark(s, lb.second, r, w);
                }
            }
        }
        if (isLoop && !op.args.empty() && op.args[0]) {
            int end = op.jumps[3] - 1;
            mark(op.args[0], i + 1, true, true);
            mark(op.args[0], end, true, true);
            loops.push_back({op.jumps[0], end});
        }
    }
}

std::string values(const Symbol* s) {
    std::string v;
    auto add = [&v](const std::string& item) {
        if (!v.empty()) v += ' ';
        v += item;
    };
    for (int i : s->ivals) add(std::to_string(i));
    for (float f : s->fvals) add(formatFloat(f));
    for (const auto& str : s->svals) add(quoteString(str));
    return v;
}

const char* symtypeName(SymType t) {
    switch (t) {
    case SymTypeParam:
        return "param";
    case SymTypeOutputParam:
        return "oparam";
    case SymTypeLocal:
        return "local";
    case SymTypeTemp:
        return "temp";
    case SymTypeGlobal:
        return "global";
    case SymTypeConst:
        return "const";
    default:
        return "local";
    }
}

std::string typeCode(const TypeSpec& t) {
    if (t.is_closure_based()) return "C";
    if (t.is_structure_based()) return "S";
    TypeSpec e = t.elementtype();
    std::string c = e.is_int()      ? "i"
                    : e.is_float()  ? "f"
                    : e.is_color()  ? "c"
                    : e.is_point()  ? "p"
                    : e.is_vector() ? "v"
                    : e.is_normal() ? "n"
                    : e.is_matrix() ? "m"
                    : e.is_string() ? "s"
                                    : "x";
    if (t.is_array()) {
        c += '[';
        if (!t.is_unsized_array()) c += std::to_string(t.arraylength());
        c += ']';
    }
    return c;
}

bool symbolUsed(const Symbol* s) {
    if (s->symtype == SymTypeParam || s->symtype == SymTypeOutputParam) return true;
    if (s->everUsed()) return true;
    for (const Symbol* f : s->fields)
        if (symbolUsed(f)) return true;
    return false;
}

} // namespace

std::string writeOSO(ShaderUnit& u, const std::string& options) {
    computeLifetimes(u);
    std::ostringstream o;
    o << "OpenShadingLanguage 1.00\n";
    o << "# Compiled by oslc 1.12.13.0\n";
    o << "# options: " << options << "\n";
    o << u.shaderType << " " << u.shaderName;
    if (!u.metaHints.empty()) {
        o << "\t";
        for (const auto& m : u.metaHints) o << m << " ";
    }
    o << "\n";
    for (const Symbol* s : u.symbols) {
        if (!symbolUsed(s)) continue;
        bool withValues =
            s->symtype == SymTypeParam || s->symtype == SymTypeOutputParam || s->isConst();
        std::string type = s->type.string();
        if (s->unsizedParam && s->type.is_array()) type = s->type.elementtype().string() + "[]";
        o << symtypeName(s->symtype) << "\t" << type << "\t" << s->name << "\t";
        if (withValues) o << values(s) << "\t\t";
        for (const auto& m : s->metaHints) o << m << " ";
        if (!s->metaHints.empty()) o << " ";
        int rf = s->readFirst == INT_MAX ? 2147483647 : s->readFirst;
        int wf = s->writeFirst == INT_MAX ? 2147483647 : s->writeFirst;
        o << "%read{" << rf << "," << s->readLast << "} %write{" << wf << "," << s->writeLast
          << "}";
        if (s->type.is_structure_based() && s->type.structspec()) {
            StructSpec* spec = s->type.structspec();
            o << " %struct{\"" << spec->name().string() << "\"} %structfields{";
            std::string codes;
            for (int i = 0; i < spec->numfields(); ++i) {
                o << (i ? "," : "") << spec->field(i).name.string();
                codes += typeCode(spec->field(i).type);
            }
            o << "} %structfieldtypes{\"" << codes << "\"} %structnfields{" << spec->numfields()
              << "}";
        }
        if (s->structParent)
            o << " %mystruct{" << s->structParent->name << "} %mystructfield{" << s->fieldIndex
              << "}";
        if (s->initexpr) o << " %initexpr";
        o << "\n";
    }
    // Code sections: one per parameter with a computed default, then the main body.
    std::vector<std::pair<int, std::string>> sections;
    // A struct computed as a whole names its section after itself; fields computed one by one
    // name their own.
    std::set<int> starts;
    for (const Symbol* s : u.symbols)
        if (s->initBegin >= 0 && s->initEnd > s->initBegin && starts.insert(s->initBegin).second)
            sections.push_back({s->initBegin, s->name});
    std::sort(sections.begin(), sections.end());
    sections.push_back({u.mainBegin, "___main___"});
    int lastFile = -1, lastLine = -1;
    size_t next = 0;
    for (int i = 0; i < int(u.ops.size()); ++i) {
        while (next < sections.size() && sections[next].first <= i) {
            o << "code " << sections[next].second << "\n";
            lastFile = lastLine = -1;
            ++next;
        }
        const Op& op = u.ops[i];
        o << "\t" << op.name;
        std::string hints;
        if (op.file != lastFile && size_t(op.file) < u.files.size()) {
            hints += "%filename{" + quoteString(u.files[op.file]) + "} ";
            lastFile = op.file;
            lastLine = -1;
        }
        if (op.line != lastLine) {
            hints += "%line{" + std::to_string(op.line) + "} ";
            lastLine = op.line;
        }
        if (!op.args.empty()) {
            std::string rw;
            for (char c : op.rw) rw += c == 'W' ? 'W' : c;
            hints += "%argrw{\"" + rw + "\"} ";
        }
        if (!op.argDerivs.empty()) {
            hints += "%argderivs{";
            for (size_t k = 0; k < op.argDerivs.size(); ++k)
                hints.append(k ? "," : "").append(std::to_string(op.argDerivs[k]));
            hints += "} ";
        }
        if (!hints.empty()) hints.pop_back();
        if (op.args.empty() && op.jumps.empty()) {
            if (!hints.empty() && op.name != "end") o << "\t" << hints;
            o << "\n";
            continue;
        }
        o << (op.name.size() < 8 ? "\t\t" : "\t");
        for (const Symbol* a : op.args) o << (a ? a->name : std::string("$unknown")) << " ";
        for (int j : op.jumps) o << j << " ";
        o << "\t" << hints << "\n";
    }
    if (sections.size() > next) {
        for (; next < sections.size(); ++next) o << "code " << sections[next].second << "\n";
    }
    return o.str();
}

} // namespace OSL::pvt
