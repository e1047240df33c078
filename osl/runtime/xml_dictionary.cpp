// XML dictionaries: documents parsed once, XPath queries and decoded attribute values cached.
#include "xml_dictionary.h"

#include <OpenImageIO/strutil.h>

#include <cctype>
#include <cstdlib>
#include <cstring>

namespace OSL {

XmlDictionary::XmlDictionary() {
    m_nodes.push_back(Node{0, pugi::xml_node()});
}

XmlDictionary::~XmlDictionary() = default;

XmlDictionary& XmlDictionary::forThisThread() {
    thread_local XmlDictionary dict;
    return dict;
}

int XmlDictionary::documentIndex(ustring dictionary, std::string& error) {
    auto it = m_documentIndex.find(dictionary);
    if (it != m_documentIndex.end()) return it->second;
    auto doc = std::make_unique<pugi::xml_document>();
    pugi::xml_parse_result parsed;
    if (OIIO::Strutil::ends_with(dictionary.string(), ".xml"))
        parsed = doc->load_file(dictionary.c_str());
    else
        parsed = doc->load_buffer(dictionary.c_str(), dictionary.length());
    if (!parsed) {
        error = OIIO::Strutil::fmt::format("XML parsed with errors: {}, at offset {}",
                                           parsed.description(), parsed.offset);
        m_documentIndex[dictionary] = -1;
        return -1;
    }
    const int index = int(m_documents.size());
    m_documents.push_back(std::move(doc));
    m_documentIndex[dictionary] = index;
    return index;
}

int XmlDictionary::select(int document, const pugi::xml_node& root, int rootID, ustring query,
                          std::string& error) {
    const QueryKey key{document, rootID, query, TypeDesc()};
    if (auto it = m_queries.find(key); it != m_queries.end()) return it->second;
    pugi::xpath_node_set matches;
    try {
        matches = root.select_nodes(query.c_str());
    } catch (const pugi::xpath_exception& e) {
        error = OIIO::Strutil::fmt::format("Invalid dict_find query '{}': {}", query, e.what());
        return 0;
    }
    int first = 0, last = 0;
    for (const pugi::xpath_node& m : matches) {
        m_nodes.push_back(Node{document, m.node()});
        const int id = int(m_nodes.size()) - 1;
        if (last)
            m_nodes[size_t(last)].next = id;
        else
            first = id;
        last = id;
    }
    m_queries[key] = first;
    return first;
}

int XmlDictionary::find(ustring dictionary, ustring query, std::string& error) {
    const int doc = documentIndex(dictionary, error);
    if (doc < 0) return doc;
    return select(doc, *m_documents[size_t(doc)], 0, query, error);
}

int XmlDictionary::find(int nodeID, ustring query, std::string& error) {
    if (nodeID <= 0 || nodeID >= int(m_nodes.size())) return 0;
    const Node& n = m_nodes[size_t(nodeID)];
    const pugi::xml_node root = n.node; // select() may grow m_nodes
    return select(n.document, root, nodeID, query, error);
}

int XmlDictionary::next(int nodeID) const {
    if (nodeID <= 0 || nodeID >= int(m_nodes.size())) return 0;
    return m_nodes[size_t(nodeID)].next;
}

int XmlDictionary::value(int nodeID, ustring attrib, TypeDesc type, void* data) {
    if (nodeID <= 0 || nodeID >= int(m_nodes.size())) return 0;
    const Node& node = m_nodes[size_t(nodeID)];
    const int n = int(type.numelements()) * int(type.aggregate);
    const QueryKey key{node.document, nodeID, attrib, type};
    if (auto it = m_queries.find(key); it != m_queries.end()) {
        size_t offset = size_t(it->second);
        if (type.basetype == TypeDesc::STRING) {
            static_cast<ustring*>(data)[0] = m_strings[offset];
        } else if (type.basetype == TypeDesc::INT) {
            for (int i = 0; i < n; ++i) static_cast<int*>(data)[i] = m_ints[offset++];
        } else {
            for (int i = 0; i < n; ++i) static_cast<float*>(data)[i] = m_floats[offset++];
        }
        return 1;
    }

    const char* text = nullptr;
    if (attrib.empty()) {
        text = node.node.value();
    } else {
        for (const pugi::xml_attribute& a : node.node.attributes())
            if (attrib == a.name()) {
                text = a.value();
                break;
            }
    }
    if (!text) return 0;

    // Numbers are separated by whitespace and/or commas.
    auto skipSeparators = [](const char*& p) {
        while (std::isspace((unsigned char)*p) || *p == ',') ++p;
    };
    if (type.basetype == TypeDesc::STRING && n == 1) {
        const ustring s(text);
        m_queries[key] = int(m_strings.size());
        m_strings.push_back(s);
        static_cast<ustring*>(data)[0] = s;
        return 1;
    }
    if (type.basetype == TypeDesc::INT) {
        m_queries[key] = int(m_ints.size());
        const char* p = text;
        for (int i = 0; i < n; ++i) {
            char* end = nullptr;
            const int v = int(std::strtol(p, &end, 10));
            p = end;
            skipSeparators(p);
            m_ints.push_back(v);
            static_cast<int*>(data)[i] = v;
        }
        return 1;
    }
    if (type.basetype == TypeDesc::FLOAT) {
        m_queries[key] = int(m_floats.size());
        const char* p = text;
        for (int i = 0; i < n; ++i) {
            char* end = nullptr;
            const float v = float(std::strtod(p, &end));
            p = end;
            skipSeparators(p);
            m_floats.push_back(v);
            static_cast<float*>(data)[i] = v;
        }
        return 1;
    }
    return 0;
}

} // namespace OSL
