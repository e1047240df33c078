// OSLTex: construction, references, names, notifications and the replies to changes of its blocks.
#include "map/osl_tex.h"

#include "compile/compiled_shader_registry.h"
#include "map/map_resources.h"
#include "map/osl_tex_class_desc.h"
#include "map/shader_update.h"

#include <trelm/core/hold.h>

using namespace TrelmSDK;

OSLTex::OSLTex(bool loading) : loading_(loading) {
    RegisterMapResourceStrings();
    GetOSLTexDesc()->MakeAutoParamBlocks(this);
    shaderBlock_ = nullptr;
    outputNames_.clear();
    ivalid_.SetEmpty();
    UpdateShader(*this, true);
    for (int code : kMapNotificationCodes) RegisterNotification(&OnNotification, this, code);
    watchedKey_ = key_;
}

OSLTex::~OSLTex() {
    UnRegisterNotification(&OnNotification, this);
    DisarmLinkedFileWatcher();
    // Undo records may keep the blocks a while longer; they must not reach back to this map.
    if (fixedBlock_) fixedBlock_->SetOwner(nullptr);
    if (shaderBlock_) shaderBlock_->SetOwner(nullptr);
}

Class_ID OSLTex::ClassID() const {
    return kOSLTexClassID;
}

void OSLTex::GetClassName(MSTR& s, bool) const {
    const bool autoUpdate = fixedBlock_ && fixedBlock_->GetInt(kOSLAutoUpdate, 0) != 0;
    std::string label;
    if (currentInfo_) {
        auto shader = currentInfo_->metadata.find("");
        if (shader != currentInfo_->metadata.end()) {
            auto it = shader->second.find("label");
            if (it != shader->second.end()) label = it->second;
        }
    }
    s = (autoUpdate ? L"OSL: " : L"osl: ") + (label.empty() ? shaderName_ : FromUTF8(label));
}

BaseInterface* OSLTex::GetInterface(Interface_ID id) {
    if (id == TrelmSDK::OSL::TESSEL_MAP_INTERFACE_ID)
        return static_cast<TrelmSDK::OSL::ITesselMapInterface*>(this);
    return Texmap::GetInterface(id);
}

RefTargetHandle OSLTex::GetReference(int i) {
    switch (i) {
    case 1:
        return fixedBlock_;
    case 2:
        return shaderBlock_;
    default:
        return nullptr;
    }
}

void OSLTex::SetReference(int i, RefTargetHandle target) {
    if (i == 1) fixedBlock_ = dynamic_cast<IParamBlock2*>(target);
    if (i == 2) shaderBlock_ = dynamic_cast<IParamBlock2*>(target);
}

Animatable* OSLTex::SubAnim(int i) {
    switch (i) {
    case 0:
        return fixedBlock_;
    case 1:
        return shaderBlock_;
    default:
        return nullptr;
    }
}

MSTR OSLTex::SubAnimName(int i, bool localized) {
    switch (i) {
    case 0:
        return localized ? MapString(kResFixedBlockName) : L"OSL Code";
    case 1:
        return localized ? MapString(kResShaderBlockName) : L"Tessel Map Parameters";
    default:
        return {};
    }
}

IParamBlock2* OSLTex::GetParamBlock(int i) {
    return i == 0 ? fixedBlock_ : shaderBlock_;
}

IParamBlock2* OSLTex::GetParamBlockByID(short id) {
    if (fixedBlock_ && fixedBlock_->ID() == id) return fixedBlock_;
    if (shaderBlock_ && shaderBlock_->ID() == id) return shaderBlock_;
    return nullptr;
}

bool OSLTex::OwnsParamBlockDesc(const ParamBlockDesc2* desc) const {
    if (!desc) return false;
    return desc == FixedBlockDesc() || (shaderBlock_ && desc == shaderBlock_->GetDesc());
}

AColor OSLTex::EvalColor(ShadeContext&) {
    return AColor(0, 0, 0, 1);
}

MSTR OSLTex::GetOSL() {
    return fixedBlock_ ? fixedBlock_->GetStr(kOSLCode, 0) : MSTR();
}

MSTR OSLTex::GetOSO() {
    return FromUTF8(CompiledShaderRegistry::Instance().CompiledText(key_));
}

RefResult OSLTex::NotifyRefChanged(const Interval&, RefTargetHandle hTarget, PartID&,
                                   RefMessage message, bool) {
    if (message != REFMSG_CHANGE) return REF_SUCCEED;
    if (hTarget && hTarget == fixedBlock_) {
        switch (fixedBlock_->LastNotifyParamID()) {
        case kOSLCode:
            CodeChanged();
            break;
        case kOSLPath:
            PathChanged();
            break;
        case kOSLAutoUpdate:
            ArmLinkedFileWatcher();
            break;
        default:
            break;
        }
    } else if (hTarget && hTarget == shaderBlock_) {
        ShaderBlockChanged();
    }
    return REF_SUCCEED;
}

void OSLTex::CodeChanged() {
    const bool replaying = theHold.RestoreOrRedoing();
    const bool callerHolds = theHold.Holding();
    if (!replaying) theHold.Begin();
    const bool wasUndoable = blockSwapUndoable_;
    blockSwapUndoable_ = callerHolds;
    UpdateShader(*this, false);
    blockSwapUndoable_ = wasUndoable;
    fixedBlock_->RefreshUI();
    if (!replaying) {
        if (fixedBlock_->GetInt(kOSLAutoUpdate, 0) != 0)
            fixedBlock_->SetValue(kOSLAutoUpdate, 0, key_ == watchedKey_);
        theHold.Accept(MapString(kResUndoShaderChange));
    }
    NotifyDependents(FOREVER, PART_ALL, REFMSG_CHANGE);
}

void OSLTex::PathChanged() {
    if (!theHold.RestoreOrRedoing()) LoadLinkedFile(fixedBlock_->GetStr(kOSLPath, 0));
    ArmLinkedFileWatcher();
}

void OSLTex::ShaderBlockChanged() {
    ivalid_.SetEmpty();
    if (!theHold.Holding() || !fixedBlock_) return;
    const MSTR preset = fixedBlock_->GetStr(kOSLPresetName, 0);
    if (!preset.empty() && preset.back() != L'*')
        fixedBlock_->SetValue(kOSLPresetName, 0, preset + L"*");
}

void OSLTex::OnNotification(void* param, NotifyInfo* info) {
    auto* map = static_cast<OSLTex*>(param);
    if (!map || !info) return;
    switch (info->intcode) {
    case 9:
        map->loading_ = true;
        break;
    case 10:
        map->loading_ = false;
        break;
    default:
        // 30 and 85 reach the map's code editor, 271 and 273 its viewport shader.
        break;
    }
}
