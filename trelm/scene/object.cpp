// Mapping channels of an object.
#include <trelm/scene/object.h>

namespace TrelmSDK {

const ChannelMapping* Object::Channel(int chan) const {
    static const ChannelMapping identity;
    auto it = channels_.find(chan);
    if (it != channels_.end()) return &it->second;
    return chan == 1 ? &identity : nullptr;
}

} // namespace TrelmSDK
