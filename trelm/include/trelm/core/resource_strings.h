// Localised texts of a module: a string table per loaded module, read by number.
#pragma once

#include <trelm/core/mstr.h>

#include <map>
#include <string>

namespace TrelmSDK {

// The handle of a loaded module (its "instance"): keys its string table and is what class
// descriptors report as their module.
struct ModuleInstance;
using HINSTANCE = ModuleInstance*;

// The handle of the module called name, created on first request; the same name gives the same
// handle for the life of the process. The host calls it when it loads a module.
HINSTANCE RegisterModuleInstance(const MSTR& name);
MSTR ModuleInstanceName(HINSTANCE module);

// Sets (replaces) one string of module's table.
void SetResourceString(HINSTANCE module, int id, const MSTR& text);
// Adds every entry of strings to module's table.
void SetResourceStrings(HINSTANCE module, const std::map<int, MSTR>& strings);
// Reads a table file into module's table: UTF-8 lines "number<TAB>text"; in the text a backslash
// escapes n (newline), t (tab) and itself. Blank lines and lines starting with '#' are skipped.
// A malformed file is reported and changes nothing (false).
bool LoadStringTableFile(HINSTANCE module, const std::string& path);

// The text of string id, or none when the module or the string is unknown. The pointer stays
// valid until that string is replaced.
const MCHAR* GetResourceString(HINSTANCE module, int id);
// Copies string id into buffer (at most bufferChars - 1 characters and a terminator) and returns
// the number of characters copied; 0, with an empty buffer, when the string is missing.
int LoadString(HINSTANCE module, int id, MCHAR* buffer, int bufferChars);

} // namespace TrelmSDK

using TrelmSDK::GetResourceString;
using TrelmSDK::HINSTANCE;
