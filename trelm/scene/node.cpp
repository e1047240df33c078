// Reading the user-defined properties text of a node.
#include <trelm/scene/node.h>

#include <algorithm>
#include <cwctype>
#include <sstream>

namespace TrelmSDK {

namespace {

MSTR Trim(const MSTR& s) {
    size_t b = 0, e = s.size();
    while (b < e && std::iswspace(s[b])) ++b;
    while (e > b && std::iswspace(s[e - 1])) --e;
    return s.substr(b, e - b);
}

bool SameKey(const MSTR& a, const MSTR& b) {
    return a.size() == b.size() &&
           std::equal(a.begin(), a.end(), b.begin(),
                      [](wchar_t x, wchar_t y) { return std::towlower(x) == std::towlower(y); });
}

} // namespace

std::vector<std::pair<MSTR, MSTR>> INode::GetUserProps() const {
    std::vector<std::pair<MSTR, MSTR>> props;
    std::wistringstream in(userProps_);
    MSTR line;
    while (std::getline(in, line)) {
        const size_t eq = line.find('=');
        if (eq == std::string::npos) continue;
        MSTR key = Trim(line.substr(0, eq));
        if (key.empty()) continue;
        props.emplace_back(std::move(key), Trim(line.substr(eq + 1)));
    }
    return props;
}

bool INode::GetUserPropString(const MSTR& key, MSTR& value) const {
    for (auto& [k, v] : GetUserProps())
        if (SameKey(k, key)) return value = v, true;
    return false;
}

bool INode::UserPropExists(const MSTR& key) const {
    MSTR ignored;
    return GetUserPropString(key, ignored);
}

} // namespace TrelmSDK
