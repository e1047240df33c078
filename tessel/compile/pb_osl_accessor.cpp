// Local names of shader block entries.
#include "compile/pb_osl_accessor.h"

#include "compile/oso_info.h"

MSTR PBOSLAccessor::GetLocalName(ReferenceMaker*, ParamID id, int) {
    if (!info_ || id < 0 || static_cast<size_t>(id) >= info_->labels.size()) return {};
    return info_->labels[static_cast<size_t>(id)];
}
