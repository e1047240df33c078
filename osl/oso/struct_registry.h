// Registry operations the OSO reader needs beyond TypeSpec's public ones.
#pragma once

#include <OSL/typespec.h>

#include <memory>

namespace OSL {

/// Returns the id of the newest registered struct with spec's name and the same field names and
/// types, registering spec when there is none; 0 when the registry is full. Find and register
/// happen under one lock, so concurrent readers of the same shader get the same id.
int find_or_register_struct(std::unique_ptr<StructSpec> spec);

} // namespace OSL
