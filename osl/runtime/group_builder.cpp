// Building shader groups: instance values, layers from loaded or searched masters, connections
// with type checks, and the program made when the group ends.
#include "group_builder.h"

#include <OpenImageIO/filesystem.h>
#include <OpenImageIO/strutil.h>

#include <algorithm>
#include <cstdio>
#include <sstream>

namespace OSL {

namespace {

std::string groupSuffix(const ShaderGroup& g) {
    return "\n        group: " + g.name.string();
}

// "name", "name[3]" (array element, or component of a triple): the base name and index.
void splitIndex(string_view full, std::string& base, int& index) {
    base = std::string(full);
    index = -1;
    const size_t open = base.find('[');
    if (open != std::string::npos && base.back() == ']') {
        index = std::atoi(base.c_str() + open + 1);
        base = base.substr(0, open);
    }
}

bool typesConnectable(const TypeSpec& src, const TypeSpec& dst) {
    if (src.is_closure_based() || dst.is_closure_based())
        return src.is_closure_based() && dst.is_closure_based() &&
               src.arraylength() == dst.arraylength();
    if (src.is_structure_based() || dst.is_structure_based()) return false;
    const TypeDesc s = src.simpletype(), d = dst.simpletype();
    if (s.basetype == TypeDesc::STRING || d.basetype == TypeDesc::STRING) return s == d;
    // An unsized array input takes the length of the array connected to it.
    if (s.arraylen != d.arraylen && !(d.arraylen < 0 && s.arraylen > 0)) return false;
    if (s.aggregate == d.aggregate) return true;
    // A single number feeds every component of a triple.
    return s.aggregate == TypeDesc::SCALAR && d.aggregate == TypeDesc::VEC3;
}

std::string readFile(const std::string& path, bool& ok) {
    std::string text;
    ok = OIIO::Filesystem::read_text_file(path, text);
    return text;
}

} // namespace

bool addParameter(ShadingSystemImpl&, ShaderGroup& g, string_view name, TypeDesc t, const void* val,
                  bool lockgeom) {
    PendingParameter p;
    p.name = ustring(name);
    p.type = t;
    p.lockgeom = lockgeom;
    const size_t size = t.size();
    p.data.resize(size);
    if (val && size) std::memcpy(p.data.data(), val, size);
    for (PendingParameter& q : g.pending)
        if (q.name == p.name) {
            q = std::move(p);
            return true;
        }
    g.pending.push_back(std::move(p));
    return true;
}

bool addShader(ShadingSystemImpl& sys, ShaderGroup& g, string_view usage, string_view shadername,
               string_view layername) {
    const ustring name(shadername);
    ShaderMasterRef master = sys.findMaster(name);
    if (!master) {
        // The pending parameters stay for the next shader that loads, as in the reference.
        sys.error("Could not find shader \"" + name.string() + "\"" + groupSuffix(g));
        return false;
    }
    ShaderInstance inst;
    inst.master = master;
    inst.usage = ustring(usage);
    // An unnamed layer is known by its shader and position, as "shader_N".
    inst.layername = layername.empty()
                         ? ustring(name.string() + "_" + std::to_string(g.layers.size()))
                         : ustring(layername);
    for (PendingParameter& p : g.pending) {
        int sym = master->findSymbol(p.name);
        if (sym < 0 || !master->symbols[size_t(sym)].isParam()) {
            // Unknown parameters are ignored, as the reference does.
            continue;
        }
        const MasterSymbol& ms = master->symbols[size_t(sym)];
        if (ms.type.is_closure_based()) {
            sys.warning("skipping assignment of closure: " + p.name.string());
            continue;
        }
        if (ms.type.is_structure_based()) continue; // its fields are parameters of their own
        // The value's type must be the parameter's (any triple for a triple, any length for an
        // unsized array), or one float for a triple; numbers are not converted.
        const TypeDesc st = ms.type.simpletype();
        const bool sameKind = st.basetype == p.type.basetype && st.aggregate == p.type.aggregate &&
                              (st.arraylen == p.type.arraylen || st.arraylen < 0);
        const bool floatToTriple = st.aggregate == TypeDesc::VEC3 && st.arraylen == 0 &&
                                   p.type == TypeDesc::FLOAT;
        if (!sameKind && !floatToTriple) {
            sys.warning("attempting to set parameter with wrong type: " + p.name.string() +
                        " (expected '" + std::string(st.c_str()) + "', received '" +
                        std::string(p.type.c_str()) + "')");
            continue;
        }
        InstanceValue iv;
        iv.symbol = sym;
        iv.type = p.type;
        iv.data = std::move(p.data);
        iv.lockgeom = p.lockgeom && ms.lockgeom;
        inst.values.push_back(std::move(iv));
    }
    g.pending.clear();
    g.layers.push_back(std::move(inst));
    return true;
}

bool connectShaders(ShadingSystemImpl& sys, ShaderGroup& g, string_view srclayer,
                    string_view srcparam, string_view dstlayer, string_view dstparam) {
    const int sl = g.findLayer(ustring(srclayer));
    if (sl < 0) {
        sys.error("ConnectShaders: source layer \"" + std::string(srclayer) + "\" not found" +
                  groupSuffix(g));
        return false;
    }
    const int dl = g.findLayer(ustring(dstlayer));
    if (dl < 0) {
        sys.error("ConnectShaders: destination layer \"" + std::string(dstlayer) + "\" not found" +
                  groupSuffix(g));
        return false;
    }
    if (sl >= dl) {
        sys.error("ConnectShaders: source layer \"" + std::string(srclayer) +
                  "\" is not upstream of destination layer \"" + std::string(dstlayer) + "\"" +
                  groupSuffix(g));
        return false;
    }
    const ShaderMaster& sm = *g.layers[size_t(sl)].master;
    const ShaderMaster& dm = *g.layers[size_t(dl)].master;
    std::string sbase, dbase;
    int sidx, didx;
    splitIndex(srcparam, sbase, sidx);
    splitIndex(dstparam, dbase, didx);
    const int ssym = sm.findSymbol(ustring(sbase));
    const int dsym = dm.findSymbol(ustring(dbase));
    if (ssym < 0 || !sm.symbols[size_t(ssym)].isParam()) {
        sys.error("ConnectShaders: \"" + std::string(srclayer) + "\" has no parameter named \"" +
                  sbase + "\"" + groupSuffix(g));
        return false;
    }
    if (dsym < 0 || !dm.symbols[size_t(dsym)].isParam()) {
        sys.error("ConnectShaders: \"" + std::string(dstlayer) + "\" has no parameter named \"" +
                  dbase + "\"" + groupSuffix(g));
        return false;
    }
    const MasterSymbol& s = sm.symbols[size_t(ssym)];
    const MasterSymbol& d = dm.symbols[size_t(dsym)];
    for (const ShaderMetadata& md : d.metadata)
        if (md.name == "allowconnect" && std::atoi(md.value.c_str()) == 0) {
            sys.error("ConnectShaders: cannot connect to " + std::string(dstlayer) + "." + dbase +
                      " because it has metadata allowconnect=0" + groupSuffix(g));
            return false;
        }

    // Structs connect field by field.
    if (s.isStruct() || d.isStruct()) {
        if (!s.isStruct() || !d.isStruct() || s.structFields.size() != d.structFields.size() ||
            sidx >= 0 || didx >= 0) {
            sys.error("ConnectShaders: cannot connect a " + s.type.string() + " (" +
                      std::string(srcparam) + ") to a " + d.type.string() + " (" +
                      std::string(dstparam) + ")" + groupSuffix(g));
            return false;
        }
        for (size_t f = 0; f < s.structFields.size(); ++f)
            if (!connectShaders(sys, g, srclayer, sbase + "." + s.structFields[f].string(),
                                dstlayer, dbase + "." + d.structFields[f].string()))
                return false;
        return true;
    }

    auto part = [](int layer, int sym, const MasterSymbol& ms, int idx, ConnectedPart& p) {
        p.layer = layer;
        p.symbol = sym;
        p.type = ms.type;
        if (idx < 0) return true;
        if (ms.type.is_array()) {
            if (ms.type.arraylength() > 0 && idx >= ms.type.arraylength()) return false;
            p.arrayIndex = idx;
            p.type = ms.type.elementtype();
        } else if (ms.type.is_triple()) {
            if (idx > 2) return false;
            p.component = idx;
            p.type = TypeSpec(TypeFloat);
        } else {
            return false;
        }
        return true;
    };
    Connection c;
    if (!part(sl, ssym, s, sidx, c.src) || !part(dl, dsym, d, didx, c.dst)) {
        sys.error("ConnectShaders: invalid index in " + std::string(srcparam) + " -> " +
                  std::string(dstparam) + groupSuffix(g));
        return false;
    }
    if (!typesConnectable(c.src.type, c.dst.type)) {
        sys.error("ConnectShaders: cannot connect a " + c.src.type.string() + " (" +
                  std::string(srcparam) + ") to a " + c.dst.type.string() + " (" +
                  std::string(dstparam) + ")" + groupSuffix(g));
        return false;
    }
    // A later connection into the same part replaces an earlier one.
    for (Connection& old : g.connections)
        if (old.dst.layer == c.dst.layer && old.dst.symbol == c.dst.symbol &&
            old.dst.arrayIndex == c.dst.arrayIndex && old.dst.component == c.dst.component) {
            old = c;
            return true;
        }
    g.connections.push_back(c);
    return true;
}

void computeNeeds(ShaderGroup& g) {
    ShaderGroup::Needs n;
    auto addUnique = [](std::vector<ustring>& v, ustring s) {
        if (std::find(v.begin(), v.end(), s) == v.end()) v.push_back(s);
    };
    for (const ShaderInstance& inst : g.layers) {
        const ShaderMaster& m = *inst.master;
        for (const MasterSymbol& s : m.symbols)
            // A %read/%write range of {2147483647,-1} is the compiler's "never".
            if (s.symtype == SymTypeGlobal && ((s.firstRead >= 0 && s.firstRead <= s.lastRead) ||
                                               (s.firstWrite >= 0 && s.firstWrite <= s.lastWrite)))
                addUnique(n.globals, s.name);
        auto constString = [&](int argIndex, ustring& out) {
            const int sym = m.args[size_t(argIndex)];
            if (sym < 0) return false;
            const MasterSymbol& s = m.symbols[size_t(sym)];
            if (s.symtype != SymTypeConst || !s.type.is_string() || s.sdefaults.empty())
                return false;
            out = s.sdefaults[0];
            return true;
        };
        for (const MasterOp& op : m.ops) {
            const std::string_view name = op.opname.string();
            if (name == "backfacing") {
                // Which side faces the viewer follows from the incoming ray and the normal.
                addUnique(n.globals, ustring("I"));
                addUnique(n.globals, ustring("N"));
            } else if (name == "getattribute") {
                const int last = op.firstArg + op.nargs - 1;
                const bool indexed = m.symbols[size_t(m.args[size_t(last - 1)])].type.is_int();
                const int args = op.nargs - (indexed ? 1 : 0);
                ustring obj, attr;
                bool ok;
                if (args == 4)
                    ok = constString(op.firstArg + 1, obj) && constString(op.firstArg + 2, attr);
                else
                    ok = constString(op.firstArg + 1, attr);
                if (!ok) {
                    n.unknownAttributes = true;
                    continue;
                }
                bool seen = false;
                for (size_t k = 0; k < n.attributes.size(); ++k)
                    if (n.attributes[k] == attr && n.scopes[k] == obj) seen = true;
                if (!seen) n.attributes.push_back(attr), n.scopes.push_back(obj);
            } else if (name == "texture" || name == "texture3d" || name == "environment" ||
                       name == "gettextureinfo") {
                ustring file;
                if (constString(op.firstArg + 1, file))
                    addUnique(n.textures, file);
                else
                    n.unknownTextures = true;
            } else if (name == "closure") {
                ustring cname;
                if (constString(op.firstArg + 1, cname) || constString(op.firstArg + 2, cname))
                    addUnique(n.closures, cname);
                else
                    n.unknownClosures = true;
            }
        }
    }
    std::sort(n.globals.begin(), n.globals.end(),
              [](ustring a, ustring b) { return a.string() < b.string(); });
    g.needs = std::move(n);
}

bool endGroup(ShadingSystemImpl& sys, ShaderGroup& g) {
    g.ended = true;
    computeNeeds(g);
    // A group may end empty (a renderer starting over); it simply has nothing to run.
    if (g.layers.empty()) {
        g.program.reset();
        g.buildError = "shader group has no layers";
        return true;
    }
    std::string error;
    g.program = buildProgram(sys, g, error);
    if (!g.program) {
        g.buildError = error;
        sys.error("Shader group \"" + g.name.string() + "\" cannot run: " + error);
        return false;
    }
    return true;
}

ShaderMasterRef ShadingSystemImpl::findMaster(ustring name) {
    {
        std::lock_guard<std::mutex> lock(mastersMutex);
        auto it = masters.find(name);
        if (it != masters.end()) return it->second;
    }
    // Not loaded yet: look for NAME.oso in the search path, then in the working folder.
    std::vector<std::string> dirs = OIIO::Strutil::splits(searchpathShader, ":");
    dirs.push_back(".");
    std::string file = name.string();
    if (!OIIO::Strutil::ends_with(file, ".oso")) file += ".oso";
    for (const std::string& dir : dirs) {
        const std::string path = dir.empty() ? file : dir + "/" + file;
        if (!OIIO::Filesystem::is_regular(path)) continue;
        bool ok = false;
        const std::string text = readFile(path, ok);
        if (!ok) continue;
        std::string err;
        ShaderMasterRef m = loadShaderMaster(name, text, err);
        if (!m) {
            error("Unable to read \"" + path + "\": " + err);
            return nullptr;
        }
        std::lock_guard<std::mutex> lock(mastersMutex);
        masters[name] = m;
        return m;
    }
    error("No .oso file could be found for shader \"" + name.string() + "\"");
    return nullptr;
}

std::string serializeGroup(const ShaderGroup& g) {
    std::ostringstream out;
    out.imbue(std::locale::classic());
    for (const ShaderInstance& inst : g.layers) {
        for (const InstanceValue& v : inst.values) {
            const MasterSymbol& ms = inst.master->symbols[size_t(v.symbol)];
            const TypeDesc t = v.type;
            out << "param " << t.c_str() << " " << ms.name.string();
            const size_t n = t.basesize() ? v.data.size() / t.basesize() : 0;
            for (size_t k = 0; k < n; ++k) {
                if (t.basetype == TypeDesc::STRING) {
                    const ustring s = reinterpret_cast<const ustring*>(v.data.data())[k];
                    out << " \"" << OIIO::Strutil::escape_chars(s.string()) << "\"";
                } else if (t.basetype == TypeDesc::INT) {
                    out << " " << reinterpret_cast<const int*>(v.data.data())[k];
                } else {
                    char buf[32];
                    std::snprintf(buf, sizeof buf, "%.9g",
                                  double(reinterpret_cast<const float*>(v.data.data())[k]));
                    out << " " << buf;
                }
            }
            if (!v.lockgeom) out << " [[int lockgeom=0]]";
            out << " ;\n";
        }
        out << "shader " << inst.master->name.string() << " " << inst.layername.string() << " ;\n";
    }
    for (const Connection& c : g.connections) {
        auto name = [&](const ConnectedPart& p) {
            std::ostringstream s;
            s << g.layers[size_t(p.layer)].layername.string() << '.'
              << g.layers[size_t(p.layer)].master->symbols[size_t(p.symbol)].name.string();
            if (p.arrayIndex >= 0) s << '[' << p.arrayIndex << ']';
            if (p.component >= 0) s << '[' << p.component << ']';
            return s.str();
        };
        out << "connect " << name(c.src) << " " << name(c.dst) << " ;\n";
    }
    return out.str();
}

} // namespace OSL
