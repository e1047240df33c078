// OSLQuery of one layer of a built shader group: the layer's shader with the values the group
// gives its parameters in place of the defaults.
#include "shader_group.h"

#include <OSL/oslquery.h>

#include <OpenImageIO/strutil.h>

namespace OSL {

namespace {

OSLQuery::Parameter metadataParam(const ShaderMetadata& md) {
    OSLQuery::Parameter p;
    p.name = ustring(md.name);
    p.type = TypeDesc(md.type.c_str());
    const std::string v = md.value;
    if (p.type.basetype == TypeDesc::STRING) {
        std::string s = v;
        if (s.size() >= 2 && s.front() == '"' && s.back() == '"') s = s.substr(1, s.size() - 2);
        p.sdefault.emplace_back(OIIO::Strutil::unescape_chars(s));
    } else {
        for (const std::string& part : OIIO::Strutil::splits(v, " ")) {
            if (part.empty()) continue;
            if (p.type.basetype == TypeDesc::INT)
                p.idefault.push_back(OIIO::Strutil::stoi(part));
            else
                p.fdefault.push_back(OIIO::Strutil::stof(part));
        }
    }
    p.validdefault = true;
    return p;
}

// The parameter's current values: the instance's when the group set them, else the defaults.
void fillValues(OSLQuery::Parameter& p, const MasterSymbol& ms, const InstanceValue* iv) {
    p.idefault = ms.idefaults;
    p.fdefault = ms.fdefaults;
    p.sdefault = ms.sdefaults;
    if (iv && iv->type.basesize()) {
        const size_t n = iv->data.size() / iv->type.basesize();
        const char* d = iv->data.data();
        p.idefault.clear(), p.fdefault.clear(), p.sdefault.clear();
        for (size_t k = 0; k < n; ++k) {
            if (iv->type.basetype == TypeDesc::STRING) {
                p.sdefault.push_back(reinterpret_cast<const ustring*>(d)[k]);
            } else {
                const float f = iv->type.basetype == TypeDesc::INT
                                    ? float(reinterpret_cast<const int*>(d)[k])
                                    : reinterpret_cast<const float*>(d)[k];
                if (p.type.basetype == TypeDesc::INT)
                    p.idefault.push_back(int(f));
                else
                    p.fdefault.push_back(f);
            }
        }
    }
    const size_t count = p.varlenarray ? 0 : p.type.numelements() * p.type.aggregate;
    if (p.type.basetype == TypeDesc::INT) {
        if (count) p.idefault.resize(count, 0);
        p.data = p.idefault.data();
    } else if (p.type.basetype == TypeDesc::FLOAT) {
        if (count) {
            // A single value given for a triple or matrix fills it, as in the OSO.
            if (p.fdefault.size() == 1 && count > 1 && p.type.aggregate > 1)
                p.fdefault.assign(count, p.fdefault[0]);
            p.fdefault.resize(count, 0.0f);
        }
        p.data = p.fdefault.data();
    } else if (p.type.basetype == TypeDesc::STRING) {
        if (count) p.sdefault.resize(count, ustring());
        p.data = p.sdefault.data();
    }
}

} // namespace

bool OSLQuery::init(const ShaderGroup* group, int layernum) {
    m_params.clear();
    m_meta.clear();
    m_shadername = ustring();
    m_shadertypename = ustring();
    if (!group || layernum < 0 || layernum >= int(group->layers.size())) {
        m_error = "no layer " + std::to_string(layernum) + " in the shader group";
        return false;
    }
    const ShaderInstance& inst = group->layers[size_t(layernum)];
    const ShaderMaster& m = *inst.master;
    m_shadername = m.osoName.empty() ? m.name : m.osoName;
    m_shadertypename = m.shadertype;
    for (const ShaderMetadata& md : m.metadata) m_meta.push_back(metadataParam(md));
    for (size_t s = 0; s < m.symbols.size(); ++s) {
        const MasterSymbol& ms = m.symbols[s];
        if (!ms.isParam()) continue;
        Parameter p;
        p.name = ms.name;
        p.type = ms.type.is_closure_based() ? TypeDesc(TypeDesc::PTR) : ms.type.simpletype();
        if (ms.isStruct()) p.type = TypeDesc();
        p.isoutput = ms.isOutput();
        p.varlenarray = ms.type.is_unsized_array();
        p.isstruct = ms.isStruct();
        p.isclosure = ms.type.is_closure_based();
        p.structname = ms.structName;
        p.fields = ms.structFields;
        p.validdefault = !ms.initexpr && !ms.isStruct() && !p.isclosure;
        for (const ShaderMetadata& md : ms.metadata) p.metadata.push_back(metadataParam(md));
        m_params.push_back(std::move(p));
        if (!m_params.back().isstruct && !m_params.back().isclosure)
            fillValues(m_params.back(), ms, inst.valueFor(int(s)));
    }
    return true;
}

} // namespace OSL
