// Dictionaries for dict_find / dict_next / dict_value: XML documents (inline text or a .xml
// file) queried with XPath, every document, query and decoded value cached after first use.
#pragma once

#include <OSL/oslconfig.h>

#include <pugixml.hpp>

#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

namespace OSL {

// Node IDs are positive indices into the nodes found so far; 0 means "not found" and -1 "the
// dictionary could not be read". One instance belongs to one thread (see forThisThread), so IDs
// a shader obtains stay valid for the rest of its execution.
class XmlDictionary {
public:
    XmlDictionary();
    ~XmlDictionary();

    // The calling thread's dictionary store.
    static XmlDictionary& forThisThread();

    // First node matching the XPath `query` in the document named by `dictionary` (XML text, or
    // the name of a file ending in ".xml"). Problems are described in `error`.
    int find(ustring dictionary, ustring query, std::string& error);
    // First node matching `query` below node `nodeID`.
    int find(int nodeID, ustring query, std::string& error);
    // The node after `nodeID` among the matches of the query that found it; 0 after the last.
    int next(int nodeID) const;
    // Reads attribute `attrib` of the node (its own value when `attrib` is empty) as `type`
    // (string, int or float based, aggregates and arrays included) into `data`. Returns 1 when
    // the node and attribute exist and the type is supported, 0 otherwise.
    int value(int nodeID, ustring attrib, TypeDesc type, void* data);

private:
    struct Node {
        int document;
        pugi::xml_node node;
        int next = 0;
    };
    struct QueryKey {
        int document, node;
        ustring name;
        TypeDesc type;
        bool operator==(const QueryKey& o) const {
            return document == o.document && node == o.node && name == o.name && type == o.type;
        }
    };
    struct QueryKeyHash {
        size_t operator()(const QueryKey& k) const {
            return k.name.hash() + 17 * size_t(k.node) + 79 * size_t(k.document) +
                   31 * size_t(k.type.basetype) + 7 * size_t(k.type.aggregate) +
                   size_t(k.type.arraylen);
        }
    };

    int documentIndex(ustring dictionary, std::string& error);
    int select(int document, const pugi::xml_node& root, int rootID, ustring query,
               std::string& error);

    std::vector<std::unique_ptr<pugi::xml_document>> m_documents;
    std::unordered_map<ustring, int> m_documentIndex; // -1 for documents that failed to load
    std::unordered_map<QueryKey, int, QueryKeyHash> m_queries; // node ID, or value offset
    std::vector<Node> m_nodes;                                 // [0] is the "not found" node
    std::vector<float> m_floats;
    std::vector<int> m_ints;
    std::vector<ustring> m_strings;
};

} // namespace OSL
