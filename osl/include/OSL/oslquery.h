// OSLQuery: the description of a compiled shader (its type, name, parameters with their types
// and defaults, and metadata), read from an .oso file or from OSO text in memory.
#pragma once

#include <OSL/oslconfig.h>

#include <string>
#include <vector>

namespace OSL {

class ShaderGroup;

namespace pvt {
class OSOReaderQuery;
} // namespace pvt

class OSLQUERYPUBLIC OSLQuery {
public:
    /// One shader parameter (or one metadata item, which uses the same record). Struct parameters
    /// are listed themselves (isstruct, structname, fields) and followed by one parameter per
    /// field, named "struct.field".
    struct OSLQUERYPUBLIC Parameter {
        ustring name;                    ///< name
        TypeDesc type;                   ///< data type (UNKNOWN for structs, PTR for closures)
        bool isoutput = false;           ///< an output parameter
        bool validdefault = false;       ///< the default is a constant written in the OSO
        bool varlenarray = false;        ///< an unsized array
        bool isstruct = false;           ///< a struct
        bool isclosure = false;          ///< a closure
        void* data = nullptr;            ///< unused by the reader; left for applications
        std::vector<int> idefault;       ///< default int values
        std::vector<float> fdefault;     ///< default float values
        std::vector<ustring> sdefault;   ///< default string values
        std::vector<ustring> spacename;  ///< space name of each triple or matrix element
        std::vector<ustring> fields;     ///< the fields' names, for a struct
        ustring structname;              ///< the struct's name, for a struct
        std::vector<Parameter> metadata; ///< metadata of the parameter

        Parameter() {}
        Parameter(const Parameter& src);
        Parameter(Parameter&& src);
        const Parameter& operator=(const Parameter&);
        const Parameter& operator=(Parameter&&);
    };

    /// An empty query; open() fills it.
    OSLQuery();

    /// Opens the named shader at once (see open()); check geterror() for the outcome.
    OSLQuery(string_view shadername, string_view searchpath = string_view()) {
        open(shadername, searchpath);
    }

    /// Describes one layer of a group built with the shading system.
    OSLQuery(const ShaderGroup* group, int layernum) { init(group, layernum); }

    ~OSLQuery();

    /// Reads a compiled shader from disk. shadername is an .oso file name or a shader name (".oso"
    /// is appended when missing); a relative name is looked for in the colon-separated searchpath
    /// folders in order, then as given. False (with an error) when not found or not parseable;
    /// everything read before is replaced either way.
    bool open(string_view shadername, string_view searchpath = string_view());

    /// Reads a compiled shader from OSO text in memory. False (with an error) when it does not
    /// parse.
    bool open_bytecode(string_view buffer);

    /// Fills the query from one layer of a shading-system group. Defined by the shading system
    /// library (the OSO reader library knows nothing of groups); link it to use this.
    bool init(const ShaderGroup* group, int layernum);

    /// "surface", "displacement", "volume", "light" or "shader".
    const ustring shadertype(void) const { return m_shadertypename; }

    const ustring shadername(void) const { return m_shadername; }

    size_t nparams(void) const { return m_params.size(); }

    /// A parameter by index or name; null when out of range or not found.
    const Parameter* getparam(size_t i) const;
    const Parameter* getparam(const std::string& name) const;
    const Parameter* getparam(ustring name) const;

    const std::vector<Parameter>& parameters(void) const { return m_params; }

    /// The shader's own metadata.
    const std::vector<Parameter>& metadata(void) const { return m_meta; }

    /// The error text of the last failures, empty when none; clears it unless told otherwise.
    std::string geterror(bool clear_error = true) {
        std::string e = m_error;
        if (clear_error) m_error.clear();
        return e;
    }

    std::vector<Parameter>::iterator begin() { return m_params.begin(); }
    std::vector<Parameter>::iterator end() { return m_params.end(); }
    std::vector<Parameter>::const_iterator cbegin() const { return m_params.cbegin(); }
    std::vector<Parameter>::const_iterator cend() const { return m_params.cend(); }

private:
    ustring m_shadername;
    ustring m_shadertypename;
    mutable std::string m_error;
    std::vector<Parameter> m_params;
    std::vector<Parameter> m_meta;
    friend class pvt::OSOReaderQuery;

    void append_error(const std::string& message) const {
        if (m_error.size()) m_error += '\n';
        m_error += message;
    }
};

inline const OSLQuery::Parameter* OSLQuery::getparam(size_t i) const {
    return i < m_params.size() ? &m_params[i] : nullptr;
}

inline const OSLQuery::Parameter* OSLQuery::getparam(const std::string& name) const {
    for (const Parameter& p : m_params)
        if (p.name == name) return &p;
    return nullptr;
}

inline const OSLQuery::Parameter* OSLQuery::getparam(ustring name) const {
    for (const Parameter& p : m_params)
        if (p.name == name) return &p;
    return nullptr;
}

} // namespace OSL
