// OSLQuery: an OSO reader that keeps the shader's name, type, parameters (with defaults, struct
// layout and metadata) and shader metadata, and stops reading at the first temporary.
#include <OSL/oslquery.h>
#include <OSL/osoreader.h>

#include <OpenImageIO/filesystem.h>
#include <OpenImageIO/strutil.h>

#include <cstdlib>
#include <optional>

namespace OSL {

namespace pvt {

class OSOReaderQuery final : public OSOReader {
public:
    OSOReaderQuery(OSLQuery& query, ErrorHandler* errors) : OSOReader(errors), m_query(query) {}

    static void add_error(const OSLQuery& query, const std::string& message) {
        query.append_error(message);
    }

    void shader(const char* shadertype, const char* name) override {
        m_query.m_shadername = ustring(name);
        m_query.m_shadertypename = ustring(shadertype);
    }

    void symbol(SymType symtype, TypeSpec typespec, const char* name) override {
        m_reading_param = symtype == SymTypeParam || symtype == SymTypeOutputParam;
        if (!m_reading_param) return;
        m_default_values = 0;
        OSLQuery::Parameter p;
        p.name = ustring(name);
        p.type = typespec.simpletype();
        p.isoutput = symtype == SymTypeOutputParam;
        p.varlenarray = typespec.is_unsized_array();
        p.isstruct = typespec.is_structure();
        p.isclosure = typespec.is_closure();
        m_query.m_params.push_back(std::move(p));
    }

    // An integer default of a float-based parameter is a float value written without a point.
    void symdefault(int def) override {
        if (OSLQuery::Parameter* p = current()) {
            if (p->type.basetype == TypeDesc::FLOAT)
                p->fdefault.push_back((float)def);
            else
                p->idefault.push_back(def);
            counted_default(*p);
        }
    }

    void symdefault(float def) override {
        if (OSLQuery::Parameter* p = current()) {
            p->fdefault.push_back(def);
            counted_default(*p);
        }
    }

    void symdefault(const char* def) override {
        if (OSLQuery::Parameter* p = current()) {
            p->sdefault.emplace_back(def);
            counted_default(*p);
        }
    }

    // Pads partially given defaults to the full size of the type (unsized arrays keep the
    // number given) and points `data` at them.
    void parameter_done() override {
        if (OSLQuery::Parameter* p = current()) {
            const size_t nvalues =
                p->varlenarray ? m_default_values : p->type.numelements() * p->type.aggregate;
            if (p->type.basetype == TypeDesc::INT) {
                p->idefault.resize(nvalues, 0);
                p->data = p->idefault.data();
            } else if (p->type.basetype == TypeDesc::FLOAT) {
                p->fdefault.resize(nvalues, 0.0f);
                p->data = p->fdefault.data();
            } else if (p->type.basetype == TypeDesc::STRING) {
                p->sdefault.resize(nvalues, ustring());
                p->data = p->sdefault.data();
            }
            if (!p->spacename.empty()) p->spacename.resize(p->type.numelements(), ustring());
        }
        m_reading_param = false;
    }

    void hint(string_view h) override {
        if (OIIO::Strutil::starts_with(h, "%meta{")) {
            OSLQuery::Parameter meta;
            if (!parse_metadata(h, meta)) return;
            if (OSLQuery::Parameter* p = current())
                p->metadata.push_back(std::move(meta));
            else
                m_query.m_meta.push_back(std::move(meta));
            return;
        }
        OSLQuery::Parameter* p = current();
        if (!p) return;
        if (auto body = braced(h, "%structfields{")) {
            for (string_view field : OIIO::Strutil::splitsv(*body, ",")) {
                field = OIIO::Strutil::strip(field);
                if (!field.empty()) p->fields.emplace_back(field);
            }
        } else if (auto body = braced(h, "%struct{")) {
            p->structname = ustring(OIIO::Strutil::strip(*body, " \""));
        } else if (h == "%initexpr") {
            p->validdefault = false;
        }
    }

    void codemarker(const char*) override { m_reading_param = false; }
    bool parse_code_section() override { return false; }
    bool stop_parsing_at_temp_symbols() override { return true; }

private:
    OSLQuery::Parameter* current() {
        return m_reading_param && !m_query.m_params.empty() ? &m_query.m_params.back() : nullptr;
    }

    void counted_default(OSLQuery::Parameter& p) {
        p.validdefault = true;
        ++m_default_values;
    }

    static std::optional<string_view> braced(string_view h, string_view prefix) {
        if (!OIIO::Strutil::starts_with(h, prefix) || !OIIO::Strutil::ends_with(h, "}"))
            return std::nullopt;
        return h.substr(prefix.size(), h.size() - prefix.size() - 1);
    }

    // %meta{TYPE,NAME,VALUE,...}: values are quoted strings or numbers, stored by the base type.
    static bool parse_metadata(string_view h, OSLQuery::Parameter& meta) {
        auto body = braced(h, "%meta{");
        if (!body) return false;
        string_view rest = *body;
        const size_t c1 = rest.find(',');
        if (c1 == string_view::npos) return false;
        meta.type = TypeDesc(OIIO::Strutil::strip(rest.substr(0, c1)));
        rest.remove_prefix(c1 + 1);
        const size_t c2 = rest.find(',');
        meta.name = ustring(OIIO::Strutil::strip(rest.substr(0, c2)));
        rest = c2 == string_view::npos ? string_view() : rest.substr(c2 + 1);
        while (!rest.empty()) {
            rest = OIIO::Strutil::strip(rest);
            std::string value;
            bool quoted = false;
            if (!rest.empty() && rest[0] == '"') {
                size_t i = 1;
                while (i < rest.size() && rest[i] != '"') i += rest[i] == '\\' ? 2 : 1;
                if (i >= rest.size()) break;
                value = OIIO::Strutil::unescape_chars(rest.substr(1, i - 1));
                rest.remove_prefix(i + 1);
                quoted = true;
            } else {
                const size_t end = rest.find(',');
                value = std::string(OIIO::Strutil::strip(rest.substr(0, end)));
                rest = rest.substr(end == string_view::npos ? rest.size() : end);
            }
            rest = OIIO::Strutil::strip(rest);
            if (!rest.empty() && rest[0] == ',') rest.remove_prefix(1);
            if (meta.type.basetype == TypeDesc::STRING) {
                meta.sdefault.emplace_back(value);
            } else if (!quoted && !value.empty()) {
                char* end = nullptr;
                if (meta.type.basetype == TypeDesc::INT) {
                    const long v = std::strtol(value.c_str(), &end, 10);
                    if (end != value.c_str()) meta.idefault.push_back((int)v);
                } else if (meta.type.basetype == TypeDesc::FLOAT) {
                    const float v = std::strtof(value.c_str(), &end);
                    if (end != value.c_str()) meta.fdefault.push_back(v);
                }
            }
        }
        return true;
    }

    OSLQuery& m_query;
    bool m_reading_param = false;
    int m_default_values = 0;
};

} // namespace pvt

namespace {

// Collects the reader's errors into the query's error text instead of printing them.
class QueryErrorCollector final : public ErrorHandler {
public:
    explicit QueryErrorCollector(const OSLQuery& query) : m_query(query) {}
    void operator()(int errcode, const std::string& msg) override {
        if (errcode >= EH_ERROR) pvt::OSOReaderQuery::add_error(m_query, msg);
    }

private:
    const OSLQuery& m_query;
};

} // namespace

static void point_data_at_defaults(OSLQuery::Parameter& p) {
    if (p.type.basetype == TypeDesc::INT)
        p.data = p.idefault.data();
    else if (p.type.basetype == TypeDesc::FLOAT)
        p.data = p.fdefault.data();
    else if (p.type.basetype == TypeDesc::STRING)
        p.data = p.sdefault.data();
    else
        p.data = nullptr;
}

OSLQuery::Parameter::Parameter(const Parameter& src)
    : name(src.name), type(src.type), isoutput(src.isoutput), validdefault(src.validdefault),
      varlenarray(src.varlenarray), isstruct(src.isstruct), isclosure(src.isclosure),
      idefault(src.idefault), fdefault(src.fdefault), sdefault(src.sdefault),
      spacename(src.spacename), fields(src.fields), structname(src.structname),
      metadata(src.metadata) {
    point_data_at_defaults(*this);
}

OSLQuery::Parameter::Parameter(Parameter&& src)
    : name(src.name), type(src.type), isoutput(src.isoutput), validdefault(src.validdefault),
      varlenarray(src.varlenarray), isstruct(src.isstruct), isclosure(src.isclosure),
      idefault(std::move(src.idefault)), fdefault(std::move(src.fdefault)),
      sdefault(std::move(src.sdefault)), spacename(std::move(src.spacename)),
      fields(std::move(src.fields)), structname(src.structname), metadata(std::move(src.metadata)) {
    point_data_at_defaults(*this);
    src.data = nullptr;
}

const OSLQuery::Parameter& OSLQuery::Parameter::operator=(const Parameter& src) {
    if (this != &src) {
        Parameter copy(src);
        *this = std::move(copy);
    }
    return *this;
}

const OSLQuery::Parameter& OSLQuery::Parameter::operator=(Parameter&& src) {
    if (this == &src) return *this;
    name = src.name;
    type = src.type;
    isoutput = src.isoutput;
    validdefault = src.validdefault;
    varlenarray = src.varlenarray;
    isstruct = src.isstruct;
    isclosure = src.isclosure;
    idefault = std::move(src.idefault);
    fdefault = std::move(src.fdefault);
    sdefault = std::move(src.sdefault);
    spacename = std::move(src.spacename);
    fields = std::move(src.fields);
    structname = src.structname;
    metadata = std::move(src.metadata);
    point_data_at_defaults(*this);
    src.data = nullptr;
    return *this;
}

OSLQuery::OSLQuery() {}

OSLQuery::~OSLQuery() {}

bool OSLQuery::open(string_view shadername, string_view searchpath) {
    m_shadername = m_shadertypename = ustring();
    m_params.clear();
    m_meta.clear();
    m_error.clear();

    std::string filename(shadername);
    if (OIIO::Filesystem::extension(filename) != ".oso") filename += ".oso";
    if (!searchpath.empty()) {
        std::vector<std::string> dirs;
        OIIO::Filesystem::searchpath_split(searchpath, dirs);
        filename = OIIO::Filesystem::searchpath_find(filename, dirs);
    }
    if (filename.empty() || !OIIO::Filesystem::is_regular(filename)) {
        append_error(OIIO::Strutil::fmt::format("File \"{}\" could not be found.", shadername));
        return false;
    }
    QueryErrorCollector errors(*this);
    pvt::OSOReaderQuery reader(*this, &errors);
    if (reader.parse_file(filename)) return true;
    if (m_error.empty())
        append_error(OIIO::Strutil::fmt::format("Could not read \"{}\"", filename));
    return false;
}

bool OSLQuery::open_bytecode(string_view buffer) {
    m_shadername = m_shadertypename = ustring();
    m_params.clear();
    m_meta.clear();
    m_error.clear();

    QueryErrorCollector errors(*this);
    pvt::OSOReaderQuery reader(*this, &errors);
    if (reader.parse_memory(std::string(buffer))) return true;
    if (m_error.empty()) append_error("Could not parse the shader bytecode");
    return false;
}

} // namespace OSL
