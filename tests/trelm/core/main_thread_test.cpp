#include <trelm/core/main_thread.h>
#include <trelm/log/system_log.h>

#include <gtest/gtest.h>

#include <atomic>
#include <stdexcept>
#include <thread>

using namespace TrelmSDK;

TEST(MainThreadTaskManager, TasksPostedFromSeveralThreadsRunInPostingOrderOnTheMainThread) {
    MainThreadTaskManager queue;
    queue.BindToCurrentThread();
    const auto mainId = std::this_thread::get_id();

    constexpr int kThreads = 6, kPerThread = 400;
    // Tickets are drawn and posted under one lock, so ticket order is posting order.
    std::mutex postLock;
    int nextTicket = 0;
    std::vector<int> ran;                              // main thread only
    std::vector<std::vector<int>> perThread(kThreads); // main thread only
    bool allOnMain = true;

    std::vector<std::thread> posters;
    for (int t = 0; t < kThreads; ++t)
        posters.emplace_back([&, t] {
            for (int i = 0; i < kPerThread; ++i) {
                std::lock_guard lock(postLock);
                const int ticket = nextTicket++;
                queue.Post([&, t, i, ticket] {
                    allOnMain = allOnMain && std::this_thread::get_id() == mainId;
                    ran.push_back(ticket);
                    perThread[t].push_back(i);
                });
            }
        });
    // The main thread pumps while the posters are still busy.
    std::size_t total = 0;
    while (total < static_cast<std::size_t>(kThreads * kPerThread))
        total += queue.WaitAndPump(std::chrono::milliseconds(50));
    for (auto& poster : posters) poster.join();

    EXPECT_TRUE(allOnMain);
    ASSERT_EQ(ran.size(), static_cast<std::size_t>(kThreads * kPerThread));
    for (std::size_t k = 0; k < ran.size(); ++k) ASSERT_EQ(ran[k], static_cast<int>(k));
    for (const auto& list : perThread) {
        ASSERT_EQ(list.size(), static_cast<std::size_t>(kPerThread));
        for (int i = 0; i < kPerThread; ++i) EXPECT_EQ(list[i], i);
    }
    EXPECT_EQ(queue.Pending(), 0u);
}

TEST(MainThreadTaskManager, NothingRunsUntilTheMainThreadPumps) {
    MainThreadTaskManager queue;
    queue.BindToCurrentThread();
    std::atomic<int> runs{0};
    std::thread([&] { queue.Post([&] { ++runs; }); }).join();
    EXPECT_EQ(runs.load(), 0);
    EXPECT_EQ(queue.Pending(), 1u);
    EXPECT_EQ(queue.Pump(), 1u);
    EXPECT_EQ(runs.load(), 1);
}

TEST(MainThreadTaskManager, PumpOffTheMainThreadRunsNothing) {
    MainThreadTaskManager queue;
    queue.BindToCurrentThread();
    EXPECT_TRUE(queue.IsMainThread());
    bool ran = false;
    queue.Post([&] { ran = true; });
    std::size_t offMain = 99;
    bool offMainIsMain = true;
    std::thread([&] {
        offMainIsMain = queue.IsMainThread();
        offMain = queue.Pump();
    }).join();
    EXPECT_FALSE(offMainIsMain);
    EXPECT_EQ(offMain, 0u);
    EXPECT_FALSE(ran);
    EXPECT_EQ(queue.Pump(), 1u);
    EXPECT_TRUE(ran);
}

TEST(MainThreadTaskManager, FirstPumpingThreadBecomesTheMainThread) {
    MainThreadTaskManager queue;
    EXPECT_FALSE(queue.IsMainThread());
    EXPECT_EQ(queue.Pump(), 0u);
    EXPECT_TRUE(queue.IsMainThread());
}

TEST(MainThreadTaskManager, TasksPostedByATaskWaitForTheNextPump) {
    MainThreadTaskManager queue;
    std::vector<std::string> order;
    queue.Post([&] {
        order.push_back("a");
        queue.Post([&] { order.push_back("c"); });
        // A nested pump must not run "c" ahead of "b".
        EXPECT_EQ(queue.Pump(), 0u);
    });
    queue.Post([&] { order.push_back("b"); });
    EXPECT_EQ(queue.Pump(), 2u);
    EXPECT_EQ(order, (std::vector<std::string>{"a", "b"}));
    EXPECT_EQ(queue.Pump(), 1u);
    EXPECT_EQ(order, (std::vector<std::string>{"a", "b", "c"}));
}

TEST(MainThreadTaskManager, AFailingTaskIsReportedAndTheRestRun) {
    MainThreadTaskManager queue;
    const auto before = GetSystemLog().Messages().LastSequence();
    bool after = false;
    queue.Post([] { throw std::runtime_error("class directory is locked"); });
    queue.Post([] { throw 42; });
    queue.Post([&] { after = true; });
    EXPECT_EQ(queue.Pump(), 3u);
    EXPECT_TRUE(after);
    const auto logged = GetSystemLog().Messages().Since(before);
    ASSERT_EQ(logged.size(), 2u);
    EXPECT_NE(logged[0].text.find("class directory is locked"), std::string::npos);
    EXPECT_EQ(logged[0].type, SYSLOG_ERROR);
}

namespace {
class CountingTask : public MainThreadTask {
public:
    CountingTask(int& executed, int& destroyed) : executed_(executed), destroyed_(destroyed) {}
    ~CountingTask() override { ++destroyed_; }
    void Execute() override { ++executed_; }

private:
    int& executed_;
    int& destroyed_;
};
} // namespace

TEST(MainThreadTaskManager, OwnsTaskObjectsAndDestroysThemAfterRunning) {
    MainThreadTaskManager queue;
    int executed = 0, destroyed = 0;
    queue.Post(std::make_unique<CountingTask>(executed, destroyed));
    queue.Post(std::unique_ptr<MainThreadTask>());
    queue.Post(std::function<void()>());
    EXPECT_EQ(queue.Pending(), 1u);
    EXPECT_EQ(destroyed, 0);
    queue.Pump();
    EXPECT_EQ(executed, 1);
    EXPECT_EQ(destroyed, 1);
}

TEST(MainThreadTaskManager, WakeHandlerHearsEveryPostAndWaitingPumpReturnsOnTimeout) {
    MainThreadTaskManager queue;
    std::atomic<int> wakes{0};
    queue.SetWakeHandler([&] { ++wakes; });
    std::thread([&] {
        queue.Post([] {});
        queue.Post([] {});
    }).join();
    EXPECT_EQ(wakes.load(), 2);
    EXPECT_EQ(queue.WaitAndPump(std::chrono::milliseconds(0)), 2u);
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(queue.WaitAndPump(std::chrono::milliseconds(20)), 0u);
    EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(15));
}

TEST(MainThreadTaskManager, ProcessWideInstanceIsACoreInterface) {
    EXPECT_EQ(GetCOREInterface(MAINTHREADTASKMANAGER_INTERFACE_ID),
              static_cast<FPInterface*>(&MainThreadTaskManager::Instance()));
    EXPECT_EQ(MAINTHREADTASKMANAGER_INTERFACE_ID, Interface_ID(0x79752833, 0x743B438E));
}
