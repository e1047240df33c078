// Class descriptors of classes that keep parameter blocks.
#pragma once

#include <trelm/core/class_desc.h>
#include <trelm/params/param_block_desc.h>

#include <vector>

namespace TrelmSDK {

// A class descriptor that lists the parameter block descriptors of its class. A ParamBlockDesc2
// constructed with a ClassDesc2 adds itself to that list and leaves it when destroyed.
class ClassDesc2 : public ClassDesc {
public:
    ClassDesc2() = default;
    ClassDesc2(const ClassDesc2&) = delete;
    ClassDesc2& operator=(const ClassDesc2&) = delete;
    ~ClassDesc2() override;

    int NumParamBlockDescs() const { return static_cast<int>(descs_.size()); }
    // Descriptor i; none, with the host's table range error reported, for an index out of range.
    ParamBlockDesc2* GetParamBlockDesc(int i);
    ParamBlockDesc2* GetParamBlockDescByID(BlockID id);
    ParamBlockDesc2* GetParamBlockDescByName(const MSTR& int_name);
    // Lists pbd (once).
    void AddParamBlockDesc(ParamBlockDesc2* pbd);
    // Empties the list (the descriptors themselves stay).
    void ClearParamBlockDescs();

    // For each listed descriptor with P_AUTO_CONSTRUCT: creates a block owned by owner and puts
    // it into owner's reference slot RefNo().
    void MakeAutoParamBlocks(ReferenceMaker* owner);

private:
    friend class ParamBlockDesc2;
    void Attach(ParamBlockDesc2* pbd);
    void Detach(ParamBlockDesc2* pbd);

    std::vector<ParamBlockDesc2*> descs_;    // listed
    std::vector<ParamBlockDesc2*> attached_; // every descriptor naming this class descriptor
};

} // namespace TrelmSDK

using TrelmSDK::ClassDesc2;
