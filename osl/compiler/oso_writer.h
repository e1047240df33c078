// Prints a compiled shader as OSO 1.00 text, computing each symbol's read/write op ranges.
#pragma once

#include "symbols.h"

#include <string>

namespace OSL::pvt {

// `options` is the command line echoed in the header comment.
std::string writeOSO(ShaderUnit& unit, const std::string& options);

} // namespace OSL::pvt
