// Checks the values passed to printf-like calls against the `%` conversions of a constant format
// string, with oslc's rules and messages.
#pragma once

#include <OSL/typespec.h>

#include <string>
#include <vector>

namespace OSL::pvt {

// Whether `name` is one of the library calls whose arguments follow a format string
// (printf, fprintf, format, error, warning).
bool isFormatFunction(const std::string& name);

// The first mismatch between `format` and the types of the values after it, as the message oslc
// reports it, or "" when they agree. `firstArgNumber` is the position of the first value in the
// call, counted from 1 (2 for printf, 3 for fprintf).
std::string checkFormatArguments(const std::string& function, const std::string& format,
                                 const std::vector<TypeSpec>& values, int firstArgNumber);

} // namespace OSL::pvt
