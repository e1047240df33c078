#include <trelm/render/thread_pool.h>

#include <gtest/gtest.h>

#include <atomic>
#include <vector>

using namespace TrelmSDK;

TEST(ThreadPool, EveryJobRunsExactlyOnceOnAWorker) {
    ThreadPool pool(4);
    EXPECT_EQ(pool.Size(), 4);
    for (int round = 0; round < 20; ++round) {
        std::vector<std::atomic<int>> runs(257);
        std::atomic<int> badWorker{0};
        ASSERT_TRUE(pool.Run(257, [&](int job, int worker) {
            ++runs[job];
            if (worker < 0 || worker >= 4) ++badWorker;
        }));
        for (auto& r : runs) ASSERT_EQ(r.load(), 1);
        EXPECT_EQ(badWorker, 0);
    }
    EXPECT_TRUE(pool.Run(0, [](int, int) {}));
}

TEST(ThreadPool, WaitingCanCancelTheRest) {
    ThreadPool pool(2);
    std::atomic<int> ran{0};
    const bool complete = pool.Run(
        10000,
        [&](int, int) {
            ++ran;
            std::this_thread::sleep_for(std::chrono::microseconds(200));
        },
        [](int, int) { return false; });
    EXPECT_FALSE(complete);
    EXPECT_LT(ran.load(), 10000);
    // The pool is usable again afterwards.
    std::atomic<int> again{0};
    EXPECT_TRUE(pool.Run(100, [&](int, int) { ++again; }));
    EXPECT_EQ(again, 100);
}
