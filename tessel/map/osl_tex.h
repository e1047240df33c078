// OSLTex: the Tessel Map. A texture map holding the fixed block "params" (where its OSL source
// comes from, the source itself, presets, auto-update) and a shader block laid out by the
// description of its compiled shader.
#pragma once

#include "compile/oso_info.h"
#include "compile/source_key.h"
#include "map/map_interfaces.h"

#include <trelm/core/file_change_monitor.h>
#include <trelm/core/notifications.h>
#include <trelm/core/texmap.h>
#include <trelm/params/iparam_block2.h>

#include <memory>
#include <vector>

namespace OSL {
class ShadingSystem;
}

// Threads: every member is written on the main thread (construction, updates, notifications, the
// linked-file watcher's deliveries). Render threads read the shader block and the description
// only while no update runs.
class OSLTex : public Texmap, public IOSLTex, public TrelmSDK::OSL::ITesselMapInterface {
public:
    explicit OSLTex(bool loading = false);
    ~OSLTex() override;

    Class_ID ClassID() const override;
    void GetClassName(MSTR& s, bool localized = true) const override;
    BaseInterface* GetInterface(Interface_ID id) override;

    // References: slot 0 empty, 1 the fixed block, 2 the shader block.
    int NumRefs() override { return 3; }
    RefTargetHandle GetReference(int i) override;
    RefResult NotifyRefChanged(const Interval& changeInt, RefTargetHandle hTarget, PartID& partID,
                               RefMessage message, bool propagate) override;

    int NumSubs() override { return 3; }
    Animatable* SubAnim(int i) override;
    MSTR SubAnimName(int i, bool localized = true) override;

    int NumParamBlocks() override { return shaderBlock_ ? 2 : 1; }
    IParamBlock2* GetParamBlock(int i) override;
    IParamBlock2* GetParamBlockByID(short id) override;
    // Whether desc is the fixed block's descriptor or that of the current shader block.
    bool OwnsParamBlockDesc(const ParamBlockDesc2* desc) const;

    // Evaluation belongs to the shading runtime; until a shader group evaluates the map it reads
    // as black.
    AColor EvalColor(ShadeContext& sc) override;

    // ITesselMapInterface
    MSTR GetShaderName() const override { return shaderName_; }
    MSTR GetOSL() override;
    MSTR GetOSO() override;
    IParamBlock2* GetShaderParamBlock() override { return shaderBlock_; }

    IParamBlock2* FixedBlock() const { return fixedBlock_; }
    IParamBlock2* ShaderBlock() const { return shaderBlock_; }
    SourceKey Key() const { return key_; }
    const std::shared_ptr<ParamBlockDesc2>& CurrentDesc() const { return currentDesc_; }
    // The description currentDesc belongs to (keeps its accessor alive with the block).
    const std::shared_ptr<const OSOInfo>& CurrentDescription() const { return currentInfo_; }
    const std::vector<MSTR>& OutputNames() const { return outputNames_; }
    OSL::ShadingSystem* ShadingSystem() const { return shadingSystem_; }
    int SavedFormat() const { return savedFormat_; }
    void SetSavedFormat(int format) { savedFormat_ = format; }
    bool IsLoading() const { return loading_; }
    const Interval& ValidityInterval() const { return ivalid_; }
    // The key remembered when the linked-file watcher was last armed.
    SourceKey WatchedKey() const { return watchedKey_; }
    TrelmSDK::FileWatchHandle WatchHandle() const { return watchHandle_; }

    // The linked-file watcher: remembers the current key, then watches the linked path while
    // "OSLAutoUpdate" is on; the map re-arms it when its path or auto-update changes.
    void ArmLinkedFileWatcher();
    // The watcher's delivery: reloads the linked file when it passes the auto-update rules.
    void ReloadLinkedFile(const MSTR& path);

private:
    friend bool UpdateShader(OSLTex& map, bool loading);
    friend void RebuildShaderBlock(OSLTex& map, IParamBlock2* oldBlock,
                                   std::shared_ptr<ParamBlockDesc2> desc, SourceKey key,
                                   bool skipValues);
    friend void ResetShaderParams(OSLTex& map);
    friend class ShaderBlockRestore;

    void SetReference(int i, RefTargetHandle target) override;

    static void OnNotification(void* param, NotifyInfo* info);
    static void OnLinkedFileChanged(const MSTR& path, void* param);
    void CodeChanged();
    void PathChanged();
    void ShaderBlockChanged();
    // Reads the file at path into "OSLCode" as one undo step, keeping "OSLAutoUpdate".
    void LoadLinkedFile(const MSTR& path);
    void DisarmLinkedFileWatcher();

    IParamBlock2* fixedBlock_ = nullptr;
    IParamBlock2* shaderBlock_ = nullptr;

    SourceKey key_ = 0;
    MSTR shaderName_;
    std::shared_ptr<ParamBlockDesc2> currentDesc_;
    std::shared_ptr<const OSOInfo> currentInfo_;
    OSL::ShadingSystem* shadingSystem_ = nullptr;
    std::vector<MSTR> outputNames_;
    int savedFormat_ = 0;
    bool loading_ = false;
    Interval ivalid_; // empty
    SourceKey watchedKey_ = 0;
    TrelmSDK::FileWatchHandle watchHandle_ = 0;
    // Set while the code handler runs inside a caller's undo record, so the block swap of the
    // rebuild joins the record that holds the code change.
    bool blockSwapUndoable_ = false;
};

// The notification codes every map registers.
inline constexpr int kMapNotificationCodes[] = {30, 85, 271, 273, 9, 10};
