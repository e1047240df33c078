// The rest of the standard library: regex match offsets, split limits, and XML dictionaries over
// good and malformed documents.
#include "../../../osl/runtime/text_search.h"
#include "../../../osl/runtime/xml_dictionary.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>
#include <string>
#include <vector>

using namespace OSL;

namespace {

int find(const char* subject, const char* pattern, bool full, std::vector<int>* results = nullptr) {
    std::string error;
    const int r =
        regexFind(ustring(subject), ustring(pattern), full, results ? results->data() : nullptr,
                  results ? int(results->size()) : 0, error);
    EXPECT_TRUE(error.empty()) << error;
    return r;
}

std::vector<std::string> split(const char* s, const char* sep, int maxsplit, int capacity,
                               int* count) {
    std::vector<ustring> out(size_t(capacity), ustring("untouched"));
    *count = splitString(s, sep, maxsplit, capacity, out.data());
    std::vector<std::string> r;
    for (const ustring& u : out) r.push_back(u.string());
    return r;
}

const char* kXml = R"(<scene>
  <object name="teapot" id="3" pos="1, 2.5 3" scale="2"/>
  <object name="box" id="7"/>
  <light name="key" color="1 0.5 0.25"/>
</scene>)";

} // namespace

TEST(Regex, SearchFindsAnywhereMatchNeedsWholeSubject) {
    EXPECT_EQ(find("foobar.baz", "bar", false), 1);
    EXPECT_EQ(find("foobar.baz", "bar", true), 0);
    EXPECT_EQ(find("foobar.baz", "foo.*", true), 1);
    EXPECT_EQ(find("foobar.baz", "^bar", false), 0);
    EXPECT_EQ(find("", "x*", true), 1);
}

TEST(Regex, ResultsHoldMatchAndGroupOffsets) {
    std::vector<int> r(6, -7);
    EXPECT_EQ(find("foobar.baz", "(b.)r\\.(b)", false, &r), 1);
    EXPECT_EQ(r, (std::vector<int>{3, 8, 3, 5, 7, 8}));
    // Entries beyond the groups hold the pattern's length.
    std::vector<int> more(6, -7);
    EXPECT_EQ(find("xabc", "ab", false, &more), 1);
    EXPECT_EQ(more, (std::vector<int>{1, 3, 2, 2, 2, 2}));
    // No match: every entry holds the pattern's length.
    std::vector<int> none(2, -7);
    EXPECT_EQ(find("xyz", "abc", false, &none), 0);
    EXPECT_EQ(none, (std::vector<int>{3, 3}));
}

TEST(Regex, EcmaScriptSyntax) {
    EXPECT_EQ(find("a1b22c333", "\\d{3}", false), 1);
    EXPECT_EQ(find("hello world", "\\bworld\\b", false), 1);
    EXPECT_EQ(find("AbC", "[a-z]+", true), 0);
}

TEST(Regex, BadPatternIsReportedNotThrown) {
    std::string error;
    std::vector<int> r(2, 5);
    EXPECT_EQ(regexFind(ustring("abc"), ustring("(unclosed"), false, r.data(), 2, error), -1);
    EXPECT_FALSE(error.empty());
    // And again from the cache, still with a message.
    std::string again;
    EXPECT_EQ(regexFind(ustring("abc"), ustring("(unclosed"), true, nullptr, 0, again), -1);
    EXPECT_EQ(again, error);
}

TEST(Split, LimitsAndDefaults) {
    int n = 0;
    auto r = split("2,4,6,8", ",", 3, 4, &n);
    EXPECT_EQ(n, 3);
    EXPECT_EQ(r[0], "2");
    EXPECT_EQ(r[1], "4");
    EXPECT_EQ(r[2], "6,8"); // the last piece keeps the rest
    EXPECT_EQ(r[3], "untouched");

    r = split("2,4,6,8", ",", 9, 4, &n); // clamped to the array's length
    EXPECT_EQ(n, 4);
    EXPECT_EQ(r[3], "8");

    r = split("a  b\tc", "", 4, 4, &n); // empty separator: runs of whitespace
    EXPECT_EQ(n, 3);
    EXPECT_EQ(r[2], "c");

    r = split("a,b", ",", 0, 4, &n);
    EXPECT_EQ(n, 0);
    EXPECT_EQ(r[0], "untouched");
    r = split("a,b", ",", -3, 4, &n);
    EXPECT_EQ(n, 0);

    r = split("", ",", 4, 4, &n);
    EXPECT_EQ(n, 0);
    r = split("a,,b", ",", 4, 4, &n);
    EXPECT_EQ(n, 3);
    EXPECT_EQ(r[1], "");
}

TEST(XmlDictionary, FindNextAndValues) {
    XmlDictionary dict;
    std::string error;
    const int first = dict.find(ustring(kXml), ustring("//object"), error);
    ASSERT_GT(first, 0) << error;
    const int second = dict.next(first);
    ASSERT_GT(second, 0);
    EXPECT_EQ(dict.next(second), 0);
    // The same query is answered from the cache with the same node.
    EXPECT_EQ(dict.find(ustring(kXml), ustring("//object"), error), first);

    ustring name;
    EXPECT_EQ(dict.value(first, ustring("name"), TypeDesc::TypeString, &name), 1);
    EXPECT_EQ(name, "teapot");
    EXPECT_EQ(dict.value(second, ustring("name"), TypeDesc::TypeString, &name), 1);
    EXPECT_EQ(name, "box");

    int id = 0;
    EXPECT_EQ(dict.value(second, ustring("id"), TypeDesc::TypeInt, &id), 1);
    EXPECT_EQ(id, 7);
    float pos[3] = {};
    EXPECT_EQ(dict.value(first, ustring("pos"), TypeDesc::TypePoint, pos), 1);
    EXPECT_FLOAT_EQ(pos[0], 1.0f);
    EXPECT_FLOAT_EQ(pos[1], 2.5f);
    EXPECT_FLOAT_EQ(pos[2], 3.0f);
    // Cached values come back identical.
    float again[3] = {};
    EXPECT_EQ(dict.value(first, ustring("pos"), TypeDesc::TypePoint, again), 1);
    EXPECT_FLOAT_EQ(again[1], 2.5f);

    float missing = 42.0f;
    EXPECT_EQ(dict.value(first, ustring("nope"), TypeDesc::TypeFloat, &missing), 0);
    EXPECT_EQ(missing, 42.0f);
    EXPECT_EQ(dict.value(0, ustring("name"), TypeDesc::TypeString, &name), 0);
    EXPECT_EQ(dict.value(9999, ustring("name"), TypeDesc::TypeString, &name), 0);
}

TEST(XmlDictionary, QueriesBelowANode) {
    XmlDictionary dict;
    std::string error;
    const int light = dict.find(ustring(kXml), ustring("//light[@name='key']"), error);
    ASSERT_GT(light, 0);
    float color[3];
    EXPECT_EQ(dict.value(light, ustring("color"), TypeDesc::TypeColor, color), 1);
    EXPECT_FLOAT_EQ(color[2], 0.25f);
    const int root = dict.find(ustring(kXml), ustring("/scene"), error);
    ASSERT_GT(root, 0);
    const int box = dict.find(root, ustring("object[@id='7']"), error);
    ASSERT_GT(box, 0);
    ustring name;
    dict.value(box, ustring("name"), TypeDesc::TypeString, &name);
    EXPECT_EQ(name, "box");
    EXPECT_EQ(dict.find(root, ustring("camera"), error), 0);
    EXPECT_EQ(dict.find(0, ustring("object"), error), 0);
    EXPECT_EQ(dict.find(-1, ustring("object"), error), 0);
    EXPECT_TRUE(error.empty()) << error;
}

TEST(XmlDictionary, MalformedDocumentsAndQueriesAreReported) {
    XmlDictionary dict;
    std::string error;
    EXPECT_EQ(dict.find(ustring("<a><b></a>"), ustring("//b"), error), -1);
    EXPECT_NE(error.find("XML parsed with errors"), std::string::npos) << error;
    // A failed document stays failed without parsing again.
    std::string again;
    EXPECT_EQ(dict.find(ustring("<a><b></a>"), ustring("//b"), again), -1);

    std::string qerr;
    EXPECT_EQ(dict.find(ustring(kXml), ustring("//object[@"), qerr), 0);
    EXPECT_NE(qerr.find("Invalid dict_find query"), std::string::npos) << qerr;

    std::string ferr;
    EXPECT_EQ(dict.find(ustring("/no/such/dictionary.xml"), ustring("//a"), ferr), -1);
    EXPECT_FALSE(ferr.empty());
}

TEST(XmlDictionary, ReadsXmlFiles) {
    const std::string path = std::string(TESSEL_BINARY_DIR) + "/library_test_dict.xml";
    {
        std::ofstream f(path);
        f << kXml;
    }
    XmlDictionary dict;
    std::string error;
    const int node = dict.find(ustring(path), ustring("//object[@name='box']"), error);
    EXPECT_GT(node, 0) << error;
    const int obj = dict.find(ustring(path), ustring("//object"), error);
    int id = 0;
    EXPECT_EQ(dict.value(obj, ustring("id"), TypeDesc::TypeInt, &id), 1);
    EXPECT_EQ(id, 3);
    std::remove(path.c_str());
}
