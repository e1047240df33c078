// Builds a ShaderMaster from OSO text through the OSO reader's callbacks.
#include "shader_master.h"

#include <OSL/osoreader.h>

#include <cstdlib>
#include <cstring>

namespace OSL {

int ShaderMaster::findSymbol(ustring symname) const {
    for (size_t i = 0; i < symbols.size(); ++i)
        if (symbols[i].name == symname) return int(i);
    return -1;
}

namespace {

// Keeps the reader's messages for the caller instead of printing them.
class CollectingErrors final : public ErrorHandler {
public:
    void operator()(int, const std::string& msg) override { text += msg; }
    std::string text;
};

// The text between "%name{" and the matching "}", or empty when the hint is another one.
bool hintBody(string_view hint, string_view name, std::string& body) {
    if (hint.size() < name.size() + 2 || hint.substr(0, name.size()) != name ||
        hint[name.size()] != '{' || hint.back() != '}')
        return false;
    body = std::string(hint.substr(name.size() + 1, hint.size() - name.size() - 2));
    return true;
}

std::vector<std::string> splitTopLevel(const std::string& s) {
    std::vector<std::string> parts;
    std::string cur;
    bool quoted = false;
    for (char c : s) {
        if (c == '"') quoted = !quoted;
        if (c == ',' && !quoted) {
            parts.push_back(cur);
            cur.clear();
        } else {
            cur += c;
        }
    }
    parts.push_back(cur);
    return parts;
}

std::string unquote(std::string s) {
    if (s.size() >= 2 && s.front() == '"' && s.back() == '"') s = s.substr(1, s.size() - 2);
    return s;
}

class MasterLoader final : public OSOReader {
public:
    MasterLoader(ShaderMaster& m, ErrorHandler* eh) : OSOReader(eh), m_master(m) {}

    void shader(const char* shadertype, const char* name) override {
        m_master.shadertype = ustring(shadertype);
        m_master.osoName = ustring(name);
    }

    void symbol(SymType symtype, TypeSpec typespec, const char* name) override {
        MasterSymbol s;
        s.symtype = symtype;
        s.type = typespec;
        s.name = ustring(name);
        m_master.symbols.push_back(std::move(s));
        m_inSymbols = true;
    }

    void symdefault(int def) override {
        MasterSymbol& s = m_master.symbols.back();
        if (s.type.simpletype().basetype == TypeDesc::FLOAT)
            s.fdefaults.push_back(float(def));
        else
            s.idefaults.push_back(def);
    }
    void symdefault(float def) override {
        MasterSymbol& s = m_master.symbols.back();
        if (s.type.simpletype().basetype == TypeDesc::INT)
            s.idefaults.push_back(int(def));
        else
            s.fdefaults.push_back(def);
    }
    void symdefault(const char* def) override {
        m_master.symbols.back().sdefaults.push_back(ustring(def));
    }

    void hint(string_view h) override {
        std::string body;
        if (!m_inSymbols && m_master.ops.empty()) {
            if (hintBody(h, "%meta", body)) m_master.metadata.push_back(parseMeta(body));
            return;
        }
        if (m_inOp) {
            MasterOp& op = m_master.ops.back();
            if (hintBody(h, "%filename", body)) {
                m_file = ustring(unquote(body));
            } else if (hintBody(h, "%line", body)) {
                m_line = std::atoi(body.c_str());
                op.line = m_line;
            } else if (hintBody(h, "%argrw", body)) {
                body = unquote(body);
                for (size_t i = 0; i < body.size() && i < 32; ++i) {
                    if (body[i] == 'w' || body[i] == 'W') op.argWrite |= 1u << i;
                    if (body[i] == 'r' || body[i] == 'W') op.argRead |= 1u << i;
                }
            } else if (hintBody(h, "%argderivs", body)) {
                for (const std::string& p : splitTopLevel(body))
                    if (!p.empty()) op.argDerivs |= 1u << std::atoi(p.c_str());
            }
            return;
        }
        MasterSymbol& s = m_master.symbols.back();
        if (h == "%derivs") {
            s.hasDerivsHint = true;
        } else if (h == "%initexpr") {
            s.initexpr = true;
        } else if (hintBody(h, "%meta", body)) {
            ShaderMetadata md = parseMeta(body);
            if (md.name == "lockgeom") s.lockgeom = std::atoi(md.value.c_str()) != 0;
            s.metadata.push_back(std::move(md));
        } else if (hintBody(h, "%read", body)) {
            auto p = splitTopLevel(body);
            if (p.size() == 2)
                s.firstRead = std::atoi(p[0].c_str()), s.lastRead = std::atoi(p[1].c_str());
        } else if (hintBody(h, "%write", body)) {
            auto p = splitTopLevel(body);
            if (p.size() == 2)
                s.firstWrite = std::atoi(p[0].c_str()), s.lastWrite = std::atoi(p[1].c_str());
        } else if (hintBody(h, "%struct", body)) {
            s.structName = ustring(unquote(body));
        } else if (hintBody(h, "%structfields", body)) {
            for (const std::string& f : splitTopLevel(body)) s.structFields.push_back(ustring(f));
        } else if (hintBody(h, "%mystruct", body)) {
            int parent = m_master.findSymbol(ustring(body));
            s.structParent = parent;
        }
    }

    void codemarker(const char* name) override {
        closeSection();
        m_inSymbols = false;
        m_section = ustring(name);
        m_sectionBegin = int(m_master.ops.size());
    }

    void codeend() override { closeSection(); }

    void instruction(int, const char* opcode) override {
        MasterOp op;
        op.opname = ustring(opcode);
        op.firstArg = int(m_master.args.size());
        op.line = m_line; // ops without a %line hint continue the previous line
        m_master.ops.push_back(op);
        m_inOp = true;
        m_jumps = 0;
    }

    void instruction_arg(const char* name) override {
        MasterOp& op = m_master.ops.back();
        int idx = m_master.findSymbol(ustring(name));
        if (idx < 0 && m_error.empty())
            m_error = "unknown symbol \"" + std::string(name) + "\" in op " + op.opname.string();
        m_master.args.push_back(idx);
        ++op.nargs;
    }

    void instruction_jump(int target) override {
        if (m_jumps < 4) m_master.ops.back().jump[m_jumps++] = target;
    }

    void instruction_end() override {
        m_master.ops.back().sourcefile = m_file;
        m_inOp = false;
    }

    std::string m_error;

private:
    static ShaderMetadata parseMeta(const std::string& body) {
        ShaderMetadata md;
        auto p = splitTopLevel(body);
        if (p.size() >= 1) md.type = p[0];
        if (p.size() >= 2) md.name = p[1];
        if (p.size() >= 3) {
            std::string v = p[2];
            for (size_t i = 3; i < p.size(); ++i) v += "," + p[i];
            md.value = unquote(v);
        }
        return md;
    }

    void closeSection() {
        if (m_section.empty()) return;
        const int end = int(m_master.ops.size());
        if (m_section == "___main___") {
            m_master.mainBegin = m_sectionBegin;
            m_master.mainEnd = end;
        } else {
            int idx = m_master.findSymbol(m_section);
            if (idx >= 0) {
                m_master.symbols[idx].initBegin = m_sectionBegin;
                m_master.symbols[idx].initEnd = end;
            }
        }
        m_section = ustring();
    }

    ShaderMaster& m_master;
    bool m_inSymbols = false;
    bool m_inOp = false;
    int m_jumps = 0;
    ustring m_section;
    int m_sectionBegin = 0;
    ustring m_file;
    int m_line = 0;
};

} // namespace

ShaderMasterRef loadShaderMaster(string_view shadername, const std::string& osoText,
                                 std::string& error) {
    auto master = std::make_shared<ShaderMaster>();
    master->name = ustring(shadername);
    CollectingErrors errors;
    MasterLoader loader(*master, &errors);
    const bool ok = loader.parse_memory(osoText);
    if (!ok || !loader.m_error.empty()) {
        error = !errors.text.empty() ? errors.text : loader.m_error;
        if (error.empty()) error = "malformed compiled shader";
        return nullptr;
    }
    if (master->mainEnd == 0 && master->ops.empty()) master->mainBegin = master->mainEnd = 0;
    return master;
}

} // namespace OSL
