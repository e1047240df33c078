// The shader headers that ship inside the compiler (stdosl.h and the struct headers), by name.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace OSL::pvt {

const std::vector<std::pair<std::string, std::string>>& builtinShaderHeaders();

} // namespace OSL::pvt
