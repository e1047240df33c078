// Worker threads handing out numbered jobs through an atomic counter.
#include <trelm/render/thread_pool.h>

#include <chrono>

namespace TrelmSDK {

ThreadPool::ThreadPool(int threads) {
    if (threads <= 0) threads = int(std::thread::hardware_concurrency());
    if (threads <= 0) threads = 1;
    for (int i = 0; i < threads; ++i) workers_.emplace_back([this, i] { WorkerLoop(i); });
}

ThreadPool::~ThreadPool() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        stop_ = true;
    }
    wake_.notify_all();
    for (auto& w : workers_) w.join();
}

void ThreadPool::WorkerLoop(int worker) {
    unsigned seen = 0;
    for (;;) {
        const std::function<void(int, int)>* job;
        int count;
        {
            std::unique_lock<std::mutex> lock(mutex_);
            wake_.wait(lock, [&] { return stop_ || generation_ != seen; });
            if (stop_) return;
            seen = generation_;
            // Woken too late for a batch that has already finished: nothing to join.
            if (!job_) continue;
            job = job_;
            count = count_;
            ++busy_;
        }
        for (int i; (i = next_.fetch_add(1)) < count;) {
            if (!cancel_.load(std::memory_order_relaxed)) (*job)(i, worker);
            done_.fetch_add(1);
        }
        {
            std::lock_guard<std::mutex> lock(mutex_);
            --busy_;
        }
        finished_.notify_all();
    }
}

bool ThreadPool::Run(int count, const std::function<void(int, int)>& job,
                     const std::function<bool(int, int)>& wait) {
    if (count <= 0) return true;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        job_ = &job;
        count_ = count;
        next_ = 0;
        done_ = 0;
        cancel_ = false;
        ++generation_;
    }
    wake_.notify_all();
    std::unique_lock<std::mutex> lock(mutex_);
    // All jobs handed out and no worker still inside the batch: done.
    auto allDone = [&] { return done_.load() >= count && busy_ == 0; };
    while (!allDone()) {
        finished_.wait_for(lock, std::chrono::milliseconds(50));
        if (wait && !cancel_) {
            lock.unlock();
            const bool go = wait(std::min(done_.load(), count), count);
            lock.lock();
            if (!go) cancel_ = true;
        }
    }
    // Still under the lock: a worker that wakes for this batch from now on finds no job.
    job_ = nullptr;
    const bool complete = !cancel_;
    lock.unlock();
    if (wait && complete) wait(count, count);
    return complete;
}

} // namespace TrelmSDK
