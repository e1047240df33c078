// Default block lookup of animatables.
#include <trelm/core/animatable.h>
#include <trelm/params/iparam_block2.h>

namespace TrelmSDK {

IParamBlock2* Animatable::GetParamBlockByID(short id) {
    for (int i = 0; i < NumParamBlocks(); ++i)
        if (IParamBlock2* pb = GetParamBlock(i); pb && pb->ID() == id) return pb;
    return nullptr;
}

} // namespace TrelmSDK
