// The linked-file side of a map: reading its .osl file and the auto-update rules for reloads.
#pragma once

#include <trelm/core/mstr.h>

#include <optional>
#include <string>

// The whole file as bytes; none when it cannot be opened or read.
std::optional<std::string> ReadShaderFile(const MSTR& path);

// Compares two "version" metadata texts as dotted version numbers (1.10 > 1.9, 2 == 2.0);
// negative, zero or positive like strcmp. Text after the numbers is ignored; an empty text or
// one that does not start with a number is the lowest version.
int CompareShaderVersions(const std::string& a, const std::string& b);

// A linked path that still names a file, or empty.
MSTR ResolveLinkedShaderPath(const MSTR& stored);
