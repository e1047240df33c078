// Regex matching with per-thread compiled patterns, and string splitting.
#include "text_search.h"

#include <OpenImageIO/strutil.h>

#include <algorithm>
#include <memory>
#include <unordered_map>

namespace OSL {

const std::regex* RegexCache::find(ustring pattern, std::string& error) {
    // A pattern that fails to compile is remembered too (as null with its message).
    struct Entry {
        std::unique_ptr<std::regex> re;
        std::string error;
    };
    thread_local std::unordered_map<ustring, Entry> cache;
    auto it = cache.find(pattern);
    if (it == cache.end()) {
        Entry e;
        try {
            e.re = std::make_unique<std::regex>(pattern.string());
        } catch (const std::regex_error& ex) {
            e.error = ex.what();
        }
        it = cache.emplace(pattern, std::move(e)).first;
    }
    if (!it->second.re) error = it->second.error;
    return it->second.re.get();
}

int regexFind(ustring subject, ustring pattern, bool full, int* results, int nresults,
              std::string& error) {
    const std::regex* re = RegexCache::find(pattern, error);
    if (!re) return -1;
    const std::string& s = subject.string();
    if (nresults <= 0) return full ? std::regex_match(s, *re) : std::regex_search(s, *re);
    std::smatch m;
    const bool found = full ? std::regex_match(s, m, *re) : std::regex_search(s, m, *re);
    for (int r = 0; r < nresults; ++r) {
        const size_t group = size_t(r / 2);
        if (group < m.size())
            results[r] = int((r & 1) ? m[group].second - s.begin() : m[group].first - s.begin());
        else
            results[r] = int(pattern.length());
    }
    return found;
}

int splitString(const std::string& s, const std::string& sep, int maxsplit, int capacity,
                ustring* out) {
    maxsplit = std::clamp(maxsplit, 0, std::max(capacity, 0));
    if (maxsplit == 0) return 0;
    const std::vector<std::string> parts = OIIO::Strutil::splits(s, sep, maxsplit);
    const int n = std::min(maxsplit, int(parts.size()));
    for (int i = 0; i < n; ++i) out[i] = ustring(parts[size_t(i)]);
    return n;
}

} // namespace OSL
