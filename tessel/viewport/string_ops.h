// OSL's string functions as the precompute functions evaluate them on the CPU, where a value is
// a text or an integer (a float argument of format arrives as its integer).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace oslo {

bool StringEndsWith(const std::string& text, const std::string& suffix);

// At most `length` characters from `start`; a negative start counts from the end.
std::string StringSubstr(const std::string& text, int start, int length);

// printf-style formatting: each conversion takes the next argument, %s its text, the integer
// and floating conversions its integer; a conversion without an argument is written as is.
std::string StringFormat(const std::string& format, const std::vector<std::string>& texts,
                         const std::vector<int32_t>& ints);

} // namespace oslo
