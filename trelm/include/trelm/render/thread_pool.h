// A fixed set of worker threads that run numbered jobs; the caller waits and may report
// progress or cancel meanwhile.
#pragma once

#include <atomic>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

namespace TrelmSDK {

class ThreadPool {
public:
    // threads <= 0: one per hardware thread.
    explicit ThreadPool(int threads = 0);
    ~ThreadPool();
    ThreadPool(const ThreadPool&) = delete;
    ThreadPool& operator=(const ThreadPool&) = delete;

    int Size() const { return int(workers_.size()); }

    // Runs job(i, worker) for i in [0, count) on the workers and returns when all are done.
    // While waiting, the calling thread calls wait(done, count) about every 50 ms and once at the
    // end; when it returns false the jobs not yet started are skipped. Returns whether every job
    // ran. One Run at a time.
    bool Run(int count, const std::function<void(int job, int worker)>& job,
             const std::function<bool(int done, int count)>& wait = nullptr);

private:
    void WorkerLoop(int worker);

    std::vector<std::thread> workers_;
    std::mutex mutex_; // guards the batch fields below and the two condition variables
    std::condition_variable wake_, finished_;
    const std::function<void(int, int)>* job_ = nullptr;
    int count_ = 0;
    unsigned generation_ = 0;
    int busy_ = 0;
    bool stop_ = false;
    std::atomic<int> next_{0}; // next job to hand out (workers, lock-free)
    std::atomic<int> done_{0}; // jobs finished
    std::atomic<bool> cancel_{false};
};

} // namespace TrelmSDK
