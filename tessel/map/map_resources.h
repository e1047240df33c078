// Resource strings of the map and the numbers by which the map reads them.
#pragma once

#include <trelm/core/mstr.h>

// Resource string numbers used by the map and its class descriptor.
enum MapResourceString : int {
    kResCategory = 2,
    kResFixedBlockName = 4, // sub-animatable 0, "OSL Code"
    kResOSLPath = 5,
    kResUndoShaderChange = 7,
    kResClassName = 9,
    kResShaderBlockName = 12, // sub-animatable 1 and the shader block
    kResOSLCode = 13,
    kResOSLAutoUpdate = 20,
    kResOSLShaderName = 21,
    kResOSLPresetName = 30,
};

// Adds the map's strings to the module's resource table (once; later calls do nothing).
void RegisterMapResourceStrings();
// The module's string id; the registered text is used when the table lacks it.
MSTR MapString(int id);
