// OSLTexClassDesc: the class descriptor of the Tessel Map, owner of the fixed block "params" and
// of every shader block descriptor.
#pragma once

#include <trelm/params/class_desc2.h>
#include <trelm/params/param_block_desc.h>

// IDs of the fixed block "params" (block 0) and of its parameters; 0, 1 and 4 are unused.
inline constexpr BlockID kFixedBlockID = 0;
inline constexpr BlockID kShaderBlockID = 1;
enum FixedParamID : ParamID {
    kOSLPath = 2,
    kOSLCode = 3,
    kOSLAutoUpdate = 5,
    kOSLShaderName = 6,
    kOSLPresetName = 7,
};

inline constexpr Class_ID kOSLTexClassID(0x7F9A7B9D, 0x6FCDF00D);

class OSLTexClassDesc : public ClassDesc2 {
public:
    bool IsPublic() override { return true; }
    // A new map; loading is true when it is about to be read from a scene.
    Animatable* Create(bool loading = false) override;
    bool OkToCreate() override { return true; }
    const MCHAR* ClassName() override;
    const MCHAR* NonLocalizedClassName() override { return L"Tessel Map"; }
    const MCHAR* InternalName() override { return L"TesselMap"; }
    SClass_ID SuperClassID() override { return TrelmSDK::TEXMAP_CLASS_ID; }
    Class_ID ClassID() override { return kOSLTexClassID; }
    const MCHAR* Category() override;
    HINSTANCE HInstance() override;
};

// The one descriptor, created on first use together with the fixed block descriptor; it is also
// made the owner of shader block descriptors built after that. Main thread.
OSLTexClassDesc* GetOSLTexDesc();
// The fixed block descriptor "params".
ParamBlockDesc2* FixedBlockDesc();
// Lists the map class in the host's class directory (once). Main thread.
bool RegisterOSLTexClass();
