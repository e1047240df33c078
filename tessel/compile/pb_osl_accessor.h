// PBOSLAccessor: the accessor of every shader block entry; it names an entry by its label.
#pragma once

#include <trelm/params/pb_accessor.h>

struct OSOInfo;

// Owned by its OSOInfo, which detaches it before it goes away; blocks that outlive the
// description then read empty names. Read on the thread that reads the block's names.
class PBOSLAccessor : public PBAccessor {
public:
    explicit PBOSLAccessor(const OSOInfo* info) : info_(info) {}
    // labels[id] of the description, so companions read the label followed by " Map".
    MSTR GetLocalName(ReferenceMaker* owner, ParamID id, int tabIndex) override;
    void Detach() { info_ = nullptr; }

private:
    const OSOInfo* info_;
};
