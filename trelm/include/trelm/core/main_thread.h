// The main-thread task queue: any thread hands over work that must run on the host's main thread
// (class directory changes, scripts, UI), and the main thread runs it in posting order.
#pragma once

#include <trelm/core/core_interface.h>

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>

namespace TrelmSDK {

// A unit of work for the main thread. The queue owns a posted task and destroys it on the main
// thread after Execute returns (or unrun, when the process ends first).
class MainThreadTask {
public:
    virtual ~MainThreadTask() = default;
    virtual void Execute() = 0;
};

// The identifier under which GetCOREInterface hands out the task manager. It is registered when
// the process starts (as soon as anything in the program posts or pumps).
inline constexpr Interface_ID MAINTHREADTASKMANAGER_INTERFACE_ID{0x79752833, 0x743B438E};

// Who pumps: the desktop host sets a wake handler that schedules Pump on its Qt event loop, so
// tasks run soon after they are posted; the CLI and tests call Pump (or WaitAndPump) themselves
// at points where running queued work is safe. Nothing runs a task anywhere else.
//
// The main thread is the thread that called BindToCurrentThread, or else the first thread that
// pumped. Post may be called from any thread; Pump only from the main thread.
class MainThreadTaskManager : public FPInterface {
public:
    static MainThreadTaskManager& Instance();
    Interface_ID GetID() const override { return MAINTHREADTASKMANAGER_INTERFACE_ID; }

    MainThreadTaskManager() = default;
    MainThreadTaskManager(const MainThreadTaskManager&) = delete;
    MainThreadTaskManager& operator=(const MainThreadTaskManager&) = delete;

    void BindToCurrentThread();
    bool IsMainThread() const;

    // Queues the task behind every task posted before it (by any thread); a null task is ignored.
    void Post(std::unique_ptr<MainThreadTask> task);
    void Post(std::function<void()> work);

    // Runs the tasks that were queued when it was called, in order, and returns how many ran.
    // Tasks they post run at the next pump, so a task that reposts itself cannot starve the
    // caller. An exception leaving a task is reported to the system log and the next task runs.
    // Called off the main thread it runs nothing, reports the misuse and returns 0; called from
    // inside a running task it returns 0 too (running later tasks first would break the order).
    std::size_t Pump();
    // Waits up to `timeout` for a task when none is queued, then pumps.
    std::size_t WaitAndPump(std::chrono::milliseconds timeout);

    std::size_t Pending() const;

    // Called on the posting thread after each Post; it must only schedule a pump (for example
    // with a queued Qt invocation), never pump itself.
    void SetWakeHandler(std::function<void()> handler);

private:
    bool claimMainThread();

    // Guards queue_, mainThread_, bound_ and wake_; Pump runs tasks outside it.
    mutable std::mutex mutex_;
    std::condition_variable posted_;
    std::deque<std::unique_ptr<MainThreadTask>> queue_;
    std::thread::id mainThread_;
    bool bound_ = false;
    std::function<void()> wake_;
    bool pumping_ = false; // main thread only
};

// Short form used by callers that only hand over a function.
inline void PostToMainThread(std::function<void()> work) {
    MainThreadTaskManager::Instance().Post(std::move(work));
}

} // namespace TrelmSDK

using TrelmSDK::MainThreadTask;
