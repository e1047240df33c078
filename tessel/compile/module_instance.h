// The module's handle with the host: keys its resource-string table.
#pragma once

#include <trelm/core/resource_strings.h>

HINSTANCE TesselModuleInstance();
// Resource string id of the module, or fallback when the table has none.
MSTR ModuleString(int id, const MSTR& fallback);
