// Format-string checking for printf-like calls. A conversion runs from `%` to the first of
// oslc's conversion letters; flags, widths and precisions in between are not examined.
#include "format_check.h"

#include <cstring>

namespace OSL::pvt {

namespace {

constexpr const char* kConversionLetters = "cdefgimnopsuvxX";
constexpr const char* kIntLetters = "dioxX";
constexpr const char* kFloatLetters = "fgcemnpv";

bool oneOf(char c, const char* set) {
    return c != '\0' && std::strchr(set, c) != nullptr;
}

// The message for a value of type `t` printed with conversion `letter`, or "" when they fit.
std::string mismatch(const std::string& function, const TypeSpec& t, char letter, int argNumber) {
    std::string head = function + " has mismatched format string and arguments (arg " +
                       std::to_string(argNumber) + " needs ";
    if (t.is_closure_based() || t.simpletype().basetype == TypeDesc::STRING)
        return letter == 's' ? "" : head + "%s)";
    if (t.simpletype().basetype == TypeDesc::INT)
        return oneOf(letter, kIntLetters) ? "" : head + "%d, %i, %o, %x, or %X)";
    if (t.simpletype().basetype == TypeDesc::FLOAT)
        return oneOf(letter, kFloatLetters) ? "" : head + "%f, %g, or %e)";
    return "";
}

} // namespace

bool isFormatFunction(const std::string& name) {
    return name == "printf" || name == "fprintf" || name == "format" || name == "error" ||
           name == "warning";
}

std::string checkFormatArguments(const std::string& function, const std::string& format,
                                 const std::vector<TypeSpec>& values, int firstArgNumber) {
    size_t next = 0;
    for (size_t i = 0; i < format.size(); ++i) {
        if (format[i] != '%') continue;
        if (i + 1 < format.size() && format[i + 1] == '%') {
            ++i;
            continue;
        }
        size_t end = i + 1;
        while (end < format.size() && !oneOf(format[end], kConversionLetters)) ++end;
        char letter = end < format.size() ? format[end] : '\0';
        i = end;
        if (next >= values.size())
            return function + " has mismatched format string and arguments (not enough args)";
        const TypeSpec& t = values[next];
        if (t.is_structure_based())
            return "struct '" + t.structspec()->name().string() + "' is not a valid argument";
        std::string msg = mismatch(function, t, letter, firstArgNumber + int(next));
        if (!msg.empty()) return msg;
        ++next;
    }
    if (next < values.size())
        return function + " has mismatched format string and arguments (too many args)";
    return "";
}

} // namespace OSL::pvt
