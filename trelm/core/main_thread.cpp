// The main-thread task queue and its pump.
#include <trelm/core/main_thread.h>
#include <trelm/log/system_log.h>

#include <exception>
#include <string>

namespace TrelmSDK {

namespace {

class FunctionTask final : public MainThreadTask {
public:
    explicit FunctionTask(std::function<void()> work) : work_(std::move(work)) {}
    void Execute() override { work_(); }

private:
    std::function<void()> work_;
};

} // namespace

MainThreadTaskManager& MainThreadTaskManager::Instance() {
    // Never destroyed: worker threads may still post while the process exits.
    static MainThreadTaskManager* manager = [] {
        auto* created = new MainThreadTaskManager;
        RegisterCOREInterface(created);
        return created;
    }();
    return *manager;
}

namespace {
// Makes the manager reachable through GetCOREInterface from the start.
[[maybe_unused]] const bool registeredAtStart = (MainThreadTaskManager::Instance(), true);
} // namespace

void MainThreadTaskManager::BindToCurrentThread() {
    std::lock_guard lock(mutex_);
    mainThread_ = std::this_thread::get_id();
    bound_ = true;
}

bool MainThreadTaskManager::IsMainThread() const {
    std::lock_guard lock(mutex_);
    return bound_ && mainThread_ == std::this_thread::get_id();
}

bool MainThreadTaskManager::claimMainThread() {
    std::lock_guard lock(mutex_);
    if (!bound_) {
        mainThread_ = std::this_thread::get_id();
        bound_ = true;
    }
    return mainThread_ == std::this_thread::get_id();
}

void MainThreadTaskManager::Post(std::unique_ptr<MainThreadTask> task) {
    if (!task) return;
    std::function<void()> wake;
    {
        std::lock_guard lock(mutex_);
        queue_.push_back(std::move(task));
        wake = wake_;
    }
    posted_.notify_all();
    if (wake) wake();
}

void MainThreadTaskManager::Post(std::function<void()> work) {
    if (work) Post(std::make_unique<FunctionTask>(std::move(work)));
}

std::size_t MainThreadTaskManager::Pump() {
    if (!claimMainThread()) {
        GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, "MainThreadTaskManager",
                                "Pump called off the main thread; the queued tasks stay queued");
        return 0;
    }
    if (pumping_) return 0;
    pumping_ = true;
    std::deque<std::unique_ptr<MainThreadTask>> batch;
    {
        std::lock_guard lock(mutex_);
        batch.swap(queue_);
    }
    std::size_t ran = 0;
    for (auto& task : batch) {
        try {
            task->Execute();
        } catch (const std::exception& e) {
            GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, "MainThreadTaskManager",
                                    std::string("a main-thread task failed: ") + e.what());
        } catch (...) {
            GetSystemLog().LogEntry(SYSLOG_ERROR, NO_DIALOG, "MainThreadTaskManager",
                                    "a main-thread task failed with an unknown exception");
        }
        task.reset();
        ++ran;
    }
    pumping_ = false;
    return ran;
}

std::size_t MainThreadTaskManager::WaitAndPump(std::chrono::milliseconds timeout) {
    {
        std::unique_lock lock(mutex_);
        posted_.wait_for(lock, timeout, [this] { return !queue_.empty(); });
    }
    return Pump();
}

std::size_t MainThreadTaskManager::Pending() const {
    std::lock_guard lock(mutex_);
    return queue_.size();
}

void MainThreadTaskManager::SetWakeHandler(std::function<void()> handler) {
    std::lock_guard lock(mutex_);
    wake_ = std::move(handler);
}

} // namespace TrelmSDK
