// Test support: OSO text assembled from declarations and instructions, and its translation.
#pragma once

#include <viewport/hlsl_generator.h>
#include <viewport/hlsl_names.h>

#include <string>

namespace viewport_test {

// A complete OSO text: header, the declaration lines, then the code lines; the code should end
// with "\tend\n" for ___main___.
inline std::string OSO(const std::string& declarations, const std::string& code) {
    return "OpenShadingLanguage 1.00\n# Compiled by oslc 1.12.13.0\nshader test\n" + declarations +
           code;
}

struct Translation {
    bool ok = false;
    std::string text = "untouched";
    oslo::_hlsl_info info;
};

inline Translation Translate(const std::string& oso, oslo::_hlsl_info inputs = {}) {
    Translation t;
    t.info = std::move(inputs);
    t.ok = oslo::GenerateHLSL("F", oso, t.info, &t.text);
    return t;
}

inline bool Contains(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

inline int Occurrences(const std::string& text, const std::string& part) {
    int count = 0;
    for (size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1))
        ++count;
    return count;
}

} // namespace viewport_test
