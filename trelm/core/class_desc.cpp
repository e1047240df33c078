// Interfaces listed on class descriptors.
#include <trelm/core/class_desc.h>

#include <algorithm>

namespace TrelmSDK {

void ClassDesc::AddInterface(FPInterface* fpi) {
    if (fpi && std::find(interfaces_.begin(), interfaces_.end(), fpi) == interfaces_.end())
        interfaces_.push_back(fpi);
}

FPInterface* ClassDesc::GetInterfaceAt(int i) const {
    return i >= 0 && i < NumInterfaces() ? interfaces_[i] : nullptr;
}

FPInterface* ClassDesc::GetInterface(Interface_ID id) {
    for (auto* fpi : interfaces_)
        if (fpi->GetID() == id) return fpi;
    return nullptr;
}

} // namespace TrelmSDK
