// Parameter block descriptor lists of class descriptors.
#include <trelm/core/sdk_errors.h>
#include <trelm/params/class_desc2.h>
#include <trelm/params/iparam_block2.h>

#include <algorithm>

namespace TrelmSDK {

ClassDesc2::~ClassDesc2() {
    for (auto* pbd : attached_) pbd->cd_ = nullptr;
}

ParamBlockDesc2* ClassDesc2::GetParamBlockDesc(int i) {
    if (i < 0 || i >= NumParamBlockDescs()) {
        ReportSDKError(kTabRangeError);
        return nullptr;
    }
    return descs_[i];
}

ParamBlockDesc2* ClassDesc2::GetParamBlockDescByID(BlockID id) {
    for (auto* pbd : descs_)
        if (pbd->ID() == id) return pbd;
    return nullptr;
}

ParamBlockDesc2* ClassDesc2::GetParamBlockDescByName(const MSTR& int_name) {
    for (auto* pbd : descs_)
        if (pbd->InternalName() == int_name) return pbd;
    return nullptr;
}

void ClassDesc2::AddParamBlockDesc(ParamBlockDesc2* pbd) {
    if (pbd && std::find(descs_.begin(), descs_.end(), pbd) == descs_.end()) descs_.push_back(pbd);
}

void ClassDesc2::ClearParamBlockDescs() {
    descs_.clear();
}

void ClassDesc2::MakeAutoParamBlocks(ReferenceMaker* owner) {
    if (!owner) return;
    for (auto* pbd : descs_) {
        if (!(pbd->Flags() & P_AUTO_CONSTRUCT) || pbd->RefNo() < 0) continue;
        IParamBlock2* pb = CreateParameterBlock2(pbd, owner);
        if (owner->ReplaceReference(pbd->RefNo(), pb) != REF_SUCCEED) pb->DeleteMe();
    }
}

void ClassDesc2::Attach(ParamBlockDesc2* pbd) {
    attached_.push_back(pbd);
}

void ClassDesc2::Detach(ParamBlockDesc2* pbd) {
    std::erase(attached_, pbd);
    std::erase(descs_, pbd);
}

} // namespace TrelmSDK
