// The string library's pattern matching and splitting, as the regex_search, regex_match and
// split ops compute them.
#pragma once

#include <OSL/oslconfig.h>

#include <regex>
#include <string>
#include <vector>

namespace OSL {

// Compiled regular expressions (ECMAScript grammar), one per pattern. Each thread keeps its own
// cache, so lookups take no lock.
class RegexCache {
public:
    // The compiled pattern, or null (with the reason in `error`) when it does not compile.
    static const std::regex* find(ustring pattern, std::string& error);
};

// Searches `subject` for `pattern` (the whole subject must match when `full`). Fills `results`
// with begin/end offsets of the match and each sub-match; entries past the sub-matches hold the
// pattern's length. Returns 1 on a match, 0 otherwise, -1 when the pattern does not compile.
int regexFind(ustring subject, ustring pattern, bool full, int* results, int nresults,
              std::string& error);

// Splits `s` at `sep` (at runs of whitespace when `sep` is empty) into at most `maxsplit`
// pieces, `maxsplit` being clamped to [0, capacity]. Returns how many pieces were stored.
int splitString(const std::string& s, const std::string& sep, int maxsplit, int capacity,
                ustring* out);

} // namespace OSL
