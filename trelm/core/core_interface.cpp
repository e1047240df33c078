// The table of process-wide core interfaces.
#include <trelm/core/core_interface.h>

#include <mutex>
#include <unordered_map>

namespace TrelmSDK {

namespace {
struct CoreInterfaces {
    std::mutex mutex; // registration happens on the main thread, lookups on any thread
    std::unordered_map<Interface_ID, FPInterface*> table;
};

CoreInterfaces& Table() {
    static auto* t = new CoreInterfaces; // outlives every static that unregisters at exit
    return *t;
}
} // namespace

void RegisterCOREInterface(FPInterface* fpi) {
    if (!fpi) return;
    auto& t = Table();
    std::lock_guard lock(t.mutex);
    t.table[fpi->GetID()] = fpi;
}

void UnregisterCOREInterface(FPInterface* fpi) {
    if (!fpi) return;
    auto& t = Table();
    std::lock_guard lock(t.mutex);
    auto it = t.table.find(fpi->GetID());
    if (it != t.table.end() && it->second == fpi) t.table.erase(it);
}

FPInterface* GetCOREInterface(Interface_ID id) {
    auto& t = Table();
    std::lock_guard lock(t.mutex);
    auto it = t.table.find(id);
    return it == t.table.end() ? nullptr : it->second;
}

} // namespace TrelmSDK
