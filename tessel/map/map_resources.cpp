// The module's resource table entries for the map: names of blocks, parameters, undo steps.
#include "map/map_resources.h"

#include "compile/module_instance.h"

#include <map>

namespace {

const std::map<int, MSTR>& MapStrings() {
    static const std::map<int, MSTR> strings = {
        {kResCategory, L"Tessel"},           {kResFixedBlockName, L"OSL Code"},
        {kResOSLPath, L"Shader File"},       {kResUndoShaderChange, L"Change OSL Shader"},
        {kResClassName, L"Tessel Map"},      {kResShaderBlockName, L"Tessel Map Parameters"},
        {kResOSLCode, L"Shader Code"},       {kResOSLAutoUpdate, L"Auto-Update from File"},
        {kResOSLShaderName, L"Shader Name"}, {kResOSLPresetName, L"Preset"},
    };
    return strings;
}

} // namespace

void RegisterMapResourceStrings() {
    static const bool done = [] {
        HINSTANCE module = TesselModuleInstance();
        for (const auto& [id, text] : MapStrings())
            if (!GetResourceString(module, id)) TrelmSDK::SetResourceString(module, id, text);
        return true;
    }();
    (void)done;
}

MSTR MapString(int id) {
    RegisterMapResourceStrings();
    auto it = MapStrings().find(id);
    return ModuleString(id, it == MapStrings().end() ? MSTR() : it->second);
}
