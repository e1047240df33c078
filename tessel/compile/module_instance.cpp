// The module's handle with the host and its resource strings.
#include "compile/module_instance.h"

HINSTANCE TesselModuleInstance() {
    static HINSTANCE instance = TrelmSDK::RegisterModuleInstance(L"tessel");
    return instance;
}

MSTR ModuleString(int id, const MSTR& fallback) {
    const MCHAR* text = GetResourceString(TesselModuleInstance(), id);
    return text ? MSTR(text) : fallback;
}
