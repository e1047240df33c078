// The oslinfo report. Defaults are printed from the query's value lists, bounded by what they
// hold, so a parameter whose defaults do not fill its type cannot read past them.
#include <OSL/oslinfo.h>
#include <OSL/oslquery.h>

#include <OpenImageIO/strutil.h>

#include <locale>
#include <sstream>

namespace OSL {

namespace {

size_t element_count(const OSLQuery::Parameter& p, size_t nvalues, size_t per_element) {
    if (p.varlenarray || p.type.arraylen < 0) return nvalues / std::max<size_t>(per_element, 1);
    return (size_t)p.type.numelements();
}

void print_string_defaults(std::ostream& out, const OSLQuery::Parameter& p, bool verbose) {
    const size_t ne = std::min(element_count(p, p.sdefault.size(), 1), p.sdefault.size());
    if (verbose) {
        for (size_t a = 0; a < ne; ++a) out << "\t\tDefault value: \"" << p.sdefault[a] << "\"\n";
    } else {
        for (size_t a = 0; a < ne; ++a) out << "\"" << p.sdefault[a] << "\" ";
        out << "\n";
    }
}

template <typename T>
void print_numeric_defaults(std::ostream& out, const OSLQuery::Parameter& p,
                            const std::vector<T>& values, bool verbose) {
    const size_t nf = std::max<size_t>(p.type.aggregate, 1);
    const size_t ne = element_count(p, values.size(), nf);
    const bool bracketed = p.type.arraylen || nf > 1;
    if (verbose) out << "\t\tDefault value:";
    if (bracketed) out << " [";
    for (size_t a = 0; a < ne; ++a) {
        if (verbose && a < p.spacename.size() && !p.spacename[a].empty())
            out << " \"" << p.spacename[a] << "\"";
        for (size_t f = 0; f < nf && a * nf + f < values.size(); ++f)
            out << ' ' << values[a * nf + f];
    }
    if (bracketed) out << " ]";
    out << "\n";
}

void print_metadata(std::ostream& out, const OSLQuery::Parameter& m) {
    out << "\t\tmetadata: " << m.type.c_str() << ' ' << m.name << " =";
    for (int v : m.idefault) out << ' ' << v;
    for (float v : m.fdefault) out << ' ' << v;
    for (ustring v : m.sdefault) out << " \"" << OIIO::Strutil::escape_chars(v) << "\"";
    out << "\n";
}

void print_parameter(std::ostream& out, const OSLQuery& q, const OSLQuery::Parameter& p,
                     bool verbose) {
    const std::string typestring =
        p.isstruct ? "struct " + p.structname.string() : std::string(p.type.c_str());
    if (verbose)
        out << "    \"" << p.name << "\" \"" << (p.isoutput ? "output " : "") << typestring
            << "\"\n";
    else
        out << (p.isoutput ? "output " : "") << typestring << ' ' << p.name << ' ';

    if (p.isstruct) {
        if (verbose) out << "\t\t";
        out << "fields: {";
        for (size_t f = 0; f < p.fields.size(); ++f) {
            if (f) out << ", ";
            const OSLQuery::Parameter* field =
                q.getparam(p.name.string() + '.' + p.fields[f].string());
            if (field)
                out << field->type.c_str() << ' ' << p.fields[f];
            else
                out << "UNKNOWN";
        }
        out << "}\n";
    } else if (!p.validdefault) {
        out << (verbose ? "\t\tUnknown default value\n" : "nodefault\n");
    } else if (p.type.basetype == TypeDesc::STRING) {
        print_string_defaults(out, p, verbose);
    } else if (p.type.basetype == TypeDesc::INT) {
        print_numeric_defaults(out, p, p.idefault, verbose);
    } else {
        print_numeric_defaults(out, p, p.fdefault, verbose);
    }
    if (verbose)
        for (const OSLQuery::Parameter& m : p.metadata) print_metadata(out, m);
}

} // namespace

bool print_oslinfo(std::ostream& out, const std::string& shadername, const OSLInfoOptions& opts) {
    // Numbers are written as the C locale writes them, whatever the process locale is.
    std::ostringstream text;
    text.imbue(std::locale::classic());

    OSLQuery q;
    q.open(shadername, opts.searchpath);
    const std::string error = q.geterror();
    if (!error.empty()) {
        out << "ERROR opening shader \"" << shadername << "\" (" << error << ")\n";
        return false;
    }
    if (opts.oneparam.empty()) {
        text << q.shadertype() << " \"" << q.shadername() << "\"\n";
        if (opts.verbose)
            for (const OSLQuery::Parameter& m : q.metadata()) print_metadata(text, m);
    }
    for (const OSLQuery::Parameter& p : q.parameters())
        if (opts.oneparam.empty() || p.name == opts.oneparam)
            print_parameter(text, q, p, opts.verbose);
    out << text.str();
    return true;
}

} // namespace OSL
