// OSL's endswith, substr and format on precompute values.
#include "string_ops.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

namespace oslo {

bool StringEndsWith(const std::string& text, const std::string& suffix) {
    return text.size() >= suffix.size() &&
           text.compare(text.size() - suffix.size(), suffix.size(), suffix) == 0;
}

std::string StringSubstr(const std::string& text, int start, int length) {
    const int size = static_cast<int>(text.size());
    if (start < 0) start += size;
    start = std::clamp(start, 0, size);
    length = std::clamp(length, 0, size - start);
    return text.substr(static_cast<size_t>(start), static_cast<size_t>(length));
}

std::string StringFormat(const std::string& format, const std::vector<std::string>& texts,
                         const std::vector<int32_t>& ints) {
    std::string result;
    size_t next = 0;
    for (size_t i = 0; i < format.size(); ++i) {
        if (format[i] != '%') {
            result += format[i];
            continue;
        }
        if (i + 1 < format.size() && format[i + 1] == '%') {
            result += '%';
            ++i;
            continue;
        }
        // Flags, width and precision, then the conversion letter.
        size_t end = i + 1;
        while (end < format.size() && std::strchr("-+ #0123456789.", format[end])) ++end;
        while (end < format.size() && std::strchr("hlLqjzt", format[end])) ++end;
        if (end >= format.size() || next >= texts.size()) {
            result += format.substr(i, end + 1 - i);
            i = end;
            continue;
        }
        const char conversion = format[end];
        // The flags and width as written, with no length modifier, for snprintf.
        std::string spec = format.substr(i, end - i);
        spec.erase(std::remove_if(spec.begin() + 1, spec.end(),
                                  [](char c) { return std::strchr("hlLqjzt", c) != nullptr; }),
                   spec.end());
        char buffer[512];
        int written = 0;
        if (conversion == 's') {
            written =
                std::snprintf(buffer, sizeof buffer, (spec + "s").c_str(), texts[next].c_str());
        } else if (std::strchr("diouxXc", conversion)) {
            written = std::snprintf(buffer, sizeof buffer, (spec + conversion).c_str(), ints[next]);
        } else if (std::strchr("fFeEgGaA", conversion)) {
            written = std::snprintf(buffer, sizeof buffer, (spec + conversion).c_str(),
                                    static_cast<double>(ints[next]));
        } else {
            result += format.substr(i, end + 1 - i);
            i = end;
            continue;
        }
        if (written > 0)
            result.append(buffer, std::min(static_cast<size_t>(written), sizeof buffer - 1));
        ++next;
        i = end;
    }
    return result;
}

} // namespace oslo
