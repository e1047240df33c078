// The map class descriptor and the fixed block "params".
#include "map/osl_tex_class_desc.h"

#include "compile/module_instance.h"
#include "compile/oso_info.h"
#include "map/example_shader.h"
#include "map/map_resources.h"
#include "map/osl_tex.h"
#include "map/pb_shader_accessor.h"

#include <trelm/core/class_directory.h>

using namespace TrelmSDK;

namespace {

// Created once and kept until the process ends: blocks and undo records refer to them.
struct MapClass {
    OSLTexClassDesc desc;
    ParamBlockDesc2* fixed = nullptr;
    MSTR className, category;
};

MapClass& TheMapClass() {
    static MapClass* made = [] {
        RegisterMapResourceStrings();
        auto* m = new MapClass;
        m->className = MapString(kResClassName);
        m->category = MapString(kResCategory);
        // 0x402: versioned, constructed into reference slot 1 by the class descriptor.
        m->fixed = new ParamBlockDesc2(
            kFixedBlockID, L"params", 0, &m->desc, P_AUTO_CONSTRUCT | P_VERSION, 1, 1,
            // params
            kOSLPath, L"OSLPath", TYPE_FILENAME, 0, kResOSLPath, p_default, L"", p_end, kOSLCode,
            L"OSLCode", TYPE_STRING, 0, kResOSLCode, p_default, FromUTF8(kExampleShader), p_end,
            kOSLAutoUpdate, L"OSLAutoUpdate", TYPE_BOOL, 0, kResOSLAutoUpdate, p_default, false,
            p_end, kOSLShaderName, L"OSLShaderName", TYPE_STRING, P_READ_ONLY | P_TRANSIENT,
            kResOSLShaderName, p_accessor, static_cast<PBAccessor*>(&PBShaderAccessor::Instance()),
            p_end, kOSLPresetName, L"OSLPresetName", TYPE_STRING, 0, kResOSLPresetName, p_default,
            L"", p_end, p_end);
        SetShaderBlockOwner(&m->desc);
        return m;
    }();
    return *made;
}

} // namespace

Animatable* OSLTexClassDesc::Create(bool loading) {
    return new OSLTex(loading);
}

const MCHAR* OSLTexClassDesc::ClassName() {
    return TheMapClass().className.c_str();
}

const MCHAR* OSLTexClassDesc::Category() {
    return TheMapClass().category.c_str();
}

HINSTANCE OSLTexClassDesc::HInstance() {
    return TesselModuleInstance();
}

OSLTexClassDesc* GetOSLTexDesc() {
    return &TheMapClass().desc;
}

ParamBlockDesc2* FixedBlockDesc() {
    return TheMapClass().fixed;
}

bool RegisterOSLTexClass() {
    OSLTexClassDesc* cd = GetOSLTexDesc();
    ClassDirectory& dir = GetClassDirectory();
    if (dir.FindClass(cd->SuperClassID(), cd->ClassID()) == cd) return true;
    return dir.AddClass(cd);
}
