// The notification table: callbacks by code, called in registration order.
#include <trelm/core/notifications.h>

#include <atomic>
#include <memory>
#include <mutex>
#include <vector>

namespace TrelmSDK {

namespace {
struct Registration {
    NOTIFYPROC proc;
    void* param;
    int code;
    std::atomic<bool> alive{true};
};

struct Table {
    std::mutex mutex; // guards entries; never held while a callback runs
    std::vector<std::shared_ptr<Registration>> entries;
};

Table& Registry() {
    static auto* table = new Table; // outlives statics that unregister at exit
    return *table;
}
} // namespace

bool RegisterNotification(NOTIFYPROC proc, void* param, int code) {
    if (!proc) return false;
    auto& t = Registry();
    std::lock_guard lock(t.mutex);
    for (auto& e : t.entries)
        if (e->proc == proc && e->param == param && e->code == code) return false;
    auto e = std::make_shared<Registration>();
    e->proc = proc, e->param = param, e->code = code;
    t.entries.push_back(std::move(e));
    return true;
}

bool UnRegisterNotification(NOTIFYPROC proc, void* param, int code) {
    auto& t = Registry();
    std::lock_guard lock(t.mutex);
    for (auto it = t.entries.begin(); it != t.entries.end(); ++it) {
        auto& e = **it;
        if (e.proc == proc && e.param == param && e.code == code) {
            e.alive = false;
            t.entries.erase(it);
            return true;
        }
    }
    return false;
}

int UnRegisterNotification(NOTIFYPROC proc, void* param) {
    auto& t = Registry();
    std::lock_guard lock(t.mutex);
    int removed = 0;
    std::erase_if(t.entries, [&](const std::shared_ptr<Registration>& e) {
        if (e->proc != proc || e->param != param) return false;
        e->alive = false;
        ++removed;
        return true;
    });
    return removed;
}

void BroadcastNotification(int code, void* callParam) {
    std::vector<std::shared_ptr<Registration>> calls;
    {
        auto& t = Registry();
        std::lock_guard lock(t.mutex);
        for (auto& e : t.entries)
            if (e->code == code) calls.push_back(e);
    }
    NotifyInfo info{code, callParam};
    for (auto& e : calls)
        if (e->alive) e->proc(e->param, &info);
}

} // namespace TrelmSDK
